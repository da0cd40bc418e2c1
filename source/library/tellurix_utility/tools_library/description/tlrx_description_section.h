// Description model: typed fields grouped in named sections, grouped in a
// description. Every raster header and parameter file lives in memory as a
// CDescription; commands address fields with dotted keys such as
// "RasterInfo.NrOfLinesPerImage". Sections and fields are declared once (key
// files here, XML schemas in tlrx_init_from_xml_schema); reading a file only
// fills values into the declared fields.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <memory>
#include <string>
#include <vector>
#include "tlrx_error_codes.h"

// ---------------------------------------------------------------- constants

constexpr int32_t CTLRX_DS_MAX_NBR_FIELDS = 5050;     // fields per section, members included
constexpr int CTLRX_DS_POOL_SLOTS = 110;              // scratch buffers of the file readers
constexpr size_t CTLRX_DS_POOL_BUFFER_SIZE = 1000000; // default scratch buffer and key-file line size
constexpr double CTLRX_DS_MISSING_DOUBLE = -9999.0;   // getDouble(n) beyond the end of a vector
constexpr const char *CTLRX_DS_DEFAULT_ROOT_TAG = "HEADER_INFO";
constexpr const char *CTLRX_DS_NOT_INITIALISED = "Not initialised";

// Shapes.
constexpr int32_t CTLRX_DS_SCALAR = 0;
constexpr int32_t CTLRX_DS_VECTOR = 1;
constexpr int32_t CTLRX_DS_MATRIX = 2;
constexpr int32_t CTLRX_DS_MULTIPLE = 3; // struct: a group of member fields
// Value types.
constexpr int32_t CTLRX_DS_INTEGER = 0;
constexpr int32_t CTLRX_DS_DOUBLE = 1;
constexpr int32_t CTLRX_DS_STRING = 2;
constexpr int32_t CTLRX_DS_FIELD_POINTER = 3; // value type of a struct field
// Shape or value type that a declaration did not recognise.
constexpr int32_t CTLRX_DS_UNRECOGNISED = -1;

// Names printed for shapes ("SCALAR", "VECTOR", "MARTIX", "MULTIPLE") and
// value types ("Integer", "Double", "String", "Field Of Section pointer");
// "WRONG" for any other code.
const char *fdfShapeName(int32_t theShape);
const char *fdfValueTypeName(int32_t theValueType);

// Verbose diagnostics ("trace level above 10") of the description files.
int fdfGetDescriptionTraceLevel();
void fdfSetDescriptionTraceLevel(int theLevel);

// ------------------------------------------------------- scratch buffer pool

// A lease on one of the CTLRX_DS_POOL_SLOTS process-wide scratch buffers,
// held for the duration of one file operation. Taking a lease when every slot
// is busy raises 848646 "All pools are busy". The buffer grows to at least
// theMinCapacity bytes and is kept in its slot for the next lease.
class CScratchBuffer {
public:
  explicit CScratchBuffer(size_t theMinCapacity = CTLRX_DS_POOL_BUFFER_SIZE);
  ~CScratchBuffer();
  CScratchBuffer(const CScratchBuffer &) = delete;
  CScratchBuffer &operator=(const CScratchBuffer &) = delete;

  char *data() const;
  size_t capacity() const;

private:
  int mSlot;
};

// Number of leases currently held.
int fdfScratchBuffersInUse();

// Reads one line (line end kept when it fits) into theBuffer, NUL-terminated.
// A line longer than theCapacity - 1 bytes keeps its first theCapacity - 1
// bytes and the rest up to the line end is skipped. Returns the number of
// bytes stored, or -1 at end of file.
long fdfReadTextLine(FILE *theFile, char *theBuffer, size_t theCapacity);

// A number cell from the text of a header or parameter file: a double is
// NaN when the text contains "NaN" or "nan", otherwise the text must be the
// number whole, as must an integer's. A text that is not dumps the field
// and raises 848642 naming the field and the text. False for a field that
// holds neither integers nor doubles (nothing is set).
class CDescriptionField;
bool fdfSetNumberFromText(CDescriptionField &theField, int32_t theRow, int32_t theCol, const char *theText);

// Existence test of description files: an empty path and the token "NotOK"
// count as absent.
bool fdfExistDescriptionFile(const char *thePath);
// The same, and a missing path ending in "_hdr" is also tried with ".sml" in
// place of "_hdr".
bool fdfExistDescriptionFileOrSml(const char *thePath);

// ---------------------------------------------------------------- the field

// One typed field: a scalar, a vector (one row), a matrix, or a struct whose
// members are fields of the same section stored right after it. Values live
// in one contiguous row-major block with a parallel block of set flags.
class CDescriptionField {
public:
  // A scalar gets its 1 x 1 block at once; other shapes start empty.
  CDescriptionField(const char *theName, int32_t theShape, int32_t theValueType, int32_t theParentIndex = -1);
  ~CDescriptionField();
  CDescriptionField(const CDescriptionField &) = delete;
  CDescriptionField &operator=(const CDescriptionField &) = delete; // use assignFrom

  // Storage. allocate() gives a zeroed, all-unset block (848644 on a struct,
  // 848646 for negative or oversized counts).
  void allocate(int32_t theRows, int32_t theCols);
  // Struct: every (vector) member gets n elements; other fields: 1 x n.
  void setNumberOfElements(int32_t theCount);
  void allocateMembers(int32_t theCount);
  void setMember(int32_t theIndex, CDescriptionField *theMember);
  CDescriptionField *getMember(int32_t theIndex) const; // nullptr outside
  int32_t getMemberCount() const;                       // structs: mColNbr, else 0

  int32_t getShape() const { return mShape; }
  int32_t getValueType() const { return mValueType; }
  const char *getName() const; // "Not initialised" for a nameless field
  bool hasName() const { return !mName.empty(); }
  int32_t getParentIndex() const { return mParentIndex; }
  int32_t getRowNbr() const { return mRowNbr; }
  int32_t getColNbr() const { return mColNbr; }
  // Struct: element count of its first member (0 without members).
  int32_t getNumberOfElements() const;

  // Typed getters. Each runs its checks in a fixed order and raises the code
  // of the first failing check (see the unit for the order).
  int32_t getInteger() const;
  int32_t getInteger(int32_t theIndex) const;
  int32_t getInteger(int32_t theRow, int32_t theCol) const;
  double getDouble() const;
  double getDouble(int32_t theIndex) const; // -9999.0 beyond the end (raises for "PulseDuration" fields)
  double getDouble(int32_t theRow, int32_t theCol) const;
  // Texts stay owned by the field.
  const char *getString() const;
  const char *getString(int32_t theIndex) const;
  const char *getString(int32_t theRow, int32_t theCol) const;

  // Typed setters: the (0, n) and (0, 0) cases of the (row, col) form.
  // A null text is stored as an empty text.
  void setInteger(int32_t theValue);
  void setInteger(int32_t theIndex, int32_t theValue);
  void setInteger(int32_t theRow, int32_t theCol, int32_t theValue);
  void setDouble(double theValue);
  void setDouble(int32_t theIndex, double theValue);
  void setDouble(int32_t theRow, int32_t theCol, double theValue);
  void setString(const char *theValue);
  void setString(int32_t theIndex, const char *theValue);
  void setString(int32_t theRow, int32_t theCol, const char *theValue);

  void unset();
  void unset(int32_t theIndex);
  void unset(int32_t theRow, int32_t theCol);

  bool isSet() const;                 // scalars only
  bool isSet(int32_t theIndex) const; // false beyond the end
  bool isSet(int32_t theRow, int32_t theCol) const;

  // Whether the field is present (the test used everywhere).
  bool holdsValue() const;

  // Copies the values of theSource (nothing when it holds no value); always
  // true or raises.
  bool assignFrom(const CDescriptionField &theSource);
  // Vectors and matrices lose their block, a scalar only its flag.
  void clear();
  // Frees the storage of every shape (a struct: its member array).
  void release();
  // The field's line to the trace (only while tracing), and as a text.
  void dump() const;
  std::string dumpText() const;

  // Scalar conversions.
  CDescriptionField &operator=(int32_t theValue);
  CDescriptionField &operator=(double theValue);
  CDescriptionField &operator=(const char *theValue);
  CDescriptionField &operator=(const std::string &theValue);
  explicit operator int32_t() const { return getInteger(); }
  explicit operator double() const { return getDouble(); }
  explicit operator std::string() const { return getString(); }

private:
  size_t cellIndex(int32_t theRow, int32_t theCol) const;
  bool checkRowCol(int32_t theRow, int32_t theCol) const;
  bool checkVectorIndex(int32_t theIndex) const; // raises 848644 for scalars and matrices
  [[noreturn]] void raise(int32_t theCode, const char *theFile, int theLine) const;
  void prepareSet(int32_t theRow, int32_t theCol, int32_t theValueType) const;
  void freeBlock();

  int32_t mParentIndex;
  std::string mName;
  int32_t mShape;
  int32_t mValueType;
  int32_t mRowNbr = 0;
  int32_t mColNbr = 0;
  std::vector<int32_t> mIntegers;
  std::vector<double> mDoubles;
  std::vector<std::string> mStrings;
  std::vector<CDescriptionField *> mMembers; // not owned
  std::vector<uint8_t> mSetFlags;
  bool mHasBlock = false;
};

// -------------------------------------------------------------- the section

class CDescriptionSection {
public:
  CDescriptionSection();
  // Declares the fields from the section's key file (see declareFromKeyFile).
  explicit CDescriptionSection(const char *theName, const char *theRootTag = nullptr);
  ~CDescriptionSection();
  CDescriptionSection(const CDescriptionSection &) = delete;
  CDescriptionSection &operator=(const CDescriptionSection &) = delete;

  // Declares the fields from a key file: theFile, or the key-file directory
  // + theSectionName + ".key". Raises 848640 without both, 261122 for a
  // missing file, 848644 for a bad type code, 848640 for missing member
  // names or 5050 fields. False when the file has no matching section.
  bool declareFromKeyFile(const char *theFile, const char *theSectionName);

  // Declaration by other builders (schemas): fields in order, the section
  // owns them. appendField returns the new field's position.
  void releaseFields();
  int32_t appendField(std::unique_ptr<CDescriptionField> theField);

  CDescriptionField *findField(const char *theName) const; // first exact match or nullptr
  CDescriptionField *getField(int32_t theIndex) const;     // nullptr outside
  int32_t getFieldCount() const { return static_cast<int32_t>(mFields.size()); }
  const char *getName() const; // "Not initialised" when nameless
  void setName(const char *theName);
  const char *getRootTag() const { return mRootTag.c_str(); }
  void setRootTag(const char *theRootTag);

  bool holdsValue() const;
  void clearValues();
  // Field-by-field copy from a section of the same name and layout; the
  // target keeps its "RealScaleFactor" and "ImaginaryScaleFactor".
  bool copyValuesFrom(const CDescriptionSection &theSource);

  void print(bool theAll) const;
  std::string printText(bool theAll) const;

  // Logs every listed field of block theSectionName of theMandatoryFile that
  // holds no value; false when any did.
  bool checkMandatory(const char *theMandatoryFile, const char *theSectionName) const;

private:
  std::string mName;
  std::vector<std::unique_ptr<CDescriptionField>> mFields;
  std::string mRootTag;
};

// ---------------------------------------------------------- the description

class CDescription {
public:
  CDescription();
  // One section per name, each declared from its key file.
  explicit CDescription(const std::vector<std::string> &theSectionNames);
  ~CDescription();
  CDescription(const CDescription &) = delete;
  // Copies the values of every common section (copyFrom with clearing);
  // raises 848640 when the copy fails.
  CDescription &operator=(const CDescription &theOther);

  // Clears this description and declares one section per name from key files.
  void initialise(const std::vector<std::string> &theSectionNames);
  // Declares from an XML schema (defined in tlrx_init_from_xml_schema.cpp).
  bool declareFromSchema(const char *theSchemaName, const std::vector<std::string> &theSectionNames);

  // Removes every section.
  void clear();
  CDescriptionSection *addSection(std::unique_ptr<CDescriptionSection> theSection);

  CDescriptionSection *findSection(const char *theName) const;
  CDescriptionSection *getSection(int32_t theIndex) const; // nullptr outside
  int32_t getSectionCount() const { return static_cast<int32_t>(mSections.size()); }

  // "Section.Field" looks in that section only (the field name is everything
  // after the first dot); a bare name is the first such field anywhere.
  CDescriptionField *findField(const char *theKey) const;
  // As findField, but a missing key prints the description and raises 848642.
  CDescriptionField &getField(const char *theKey) const;
  // As getField, and a declared field that holds no value (a setting the
  // file lacks) also raises 848642 with the key.
  CDescriptionField &getFieldWithValue(const char *theKey) const;

  bool copyFrom(const CDescription &theOther, bool theClearFirst);
  void clearValues();
  bool holdsValue() const;

  void print(bool theAll) const;
  std::string printText(bool theAll) const;

  // Mandatory file: theName when it exists, else the mandatory directory +
  // theName + ".mandatory". False (or 848641 with theRaise) when a listed
  // field holds no value.
  bool checkMandatory(const char *theName, bool theRaise) const;

  const char *getRootTag() const { return mRootTag.c_str(); }
  void setRootTag(const char *theRootTag);

  // File forms, defined with the XML and text forms (tlrx_description_xml.cpp).
  bool readFromFile(const char *theName, bool theMustExist);
  bool writeToFile(const char *theName, bool theAlsoText, bool theRaise);
  bool readXML(const char *theFileName, bool theRaiseIfMissing);
  bool writeXML(const char *theFileName, bool theFresh, bool theRaise);
  // Why the last readFromFile or readXML failed: the parser's error with its
  // line, a missing root or section, a file that is not a regular file.
  // Empty after a success and for a missing file (its name says it all).
  const std::string &getReadError() const { return mReadError; }

private:
  std::vector<std::unique_ptr<CDescriptionSection>> mSections;
  std::string mRootTag;
  std::string mReadError;
};
