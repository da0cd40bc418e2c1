// ENVI header files written beside rasters: the skip list, the vocabulary,
// the raster layout ENVI can describe, and the header text itself.
//
// The whole text is composed in memory before the file is created, so a
// header that lacks a field never leaves a half-written ".hdr" behind.
#include "tlrx_envi_util.h"

#include "tlrx_cell_types.h"
#include "tlrx_description_section.h"
#include "tlrx_description_xml.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_header_numbers.h"
#include "tlrx_read_write_map_info.h"
#include "tlrx_standard_header.h"

#include <strings.h>

#include <cerrno>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <exception>

namespace {

// Names of rasters that get no ENVI header.
const char *const CTLRX_ENVI_EXCLUDED_SUFFIXES[] = {
    ".tif_hdr", ".tif", "_orb", "_orb_hdr", ".orb", "_orb.sml", ".TellurixParameterExtracted", "_par", "_par_hdr",
};

// Keys of "RasterInfo.OtherInfo" listed in the description block, with the
// label each is written under.
struct SAcquisitionTime {
  const char *mKey;
  const char *mFallbackKey;
  const char *mLabel;
};
const SAcquisitionTime CTLRX_ENVI_TIMES[] = {
    {"ACQUISITION TIME", "NEW_ACQUISITION TIME", "ACQUISITION TIME ="},
    {"MASTER ACQUISITION TIME", nullptr, "MASTER ACQUISITION TIME ="},
    {"SLAVE ACQUISITION TIME", nullptr, "SLAVE ACQUISITION TIME ="},
};

// How ENVI holds each cell type (index = cell type code). ENVI's complex
// types exist only for floats, so integer pairs become two bands of their
// part type, interleaved by pixel. Signed bytes and packed bits have no ENVI
// type at all: readers would take them for unsigned bytes.
struct SEnviCellLayout {
  int32_t mBands;
  const char *mUnsupported; // why ENVI cannot hold it, nullptr when it can
};
const SEnviCellLayout CTLRX_ENVI_CELLS[CTLRX_NBR_CELL_TYPES] = {
    {0, "ENVI has no signed 8-bit type"}, // BYTE
    {0, "ENVI has no signed 8-bit type"}, // BYTE_COMPLEX
    {1, nullptr},                         // UNSIGNED_BYTE
    {2, nullptr},                         // UBYTE_COMPLEX
    {1, nullptr},                         // SHORT
    {1, nullptr},                         // UNSIGNED_SHORT
    {2, nullptr},                         // SHORT_COMPLEX
    {1, nullptr},                         // FLOAT
    {1, nullptr},                         // FLOAT_COMPLEX
    {1, nullptr},                         // DOUBLE
    {1, nullptr},                         // DOUBLE_COMPLEX
    {1, nullptr},                         // UNSIGNED_INT
    {1, nullptr},                         // INT
    {0, "ENVI has no packed-bit type"},   // BIT
    {2, nullptr},                         // UNSIGNED_SHORT_COMPLEX
};

constexpr int32_t CTLRX_ENVI_MAX_WIDTH = 256; // key word padding a vocabulary may ask for
constexpr int CTLRX_ENVI_ITEMS_PER_LINE = 8;  // list items per line of the class lines
constexpr const char *CTLRX_ENVI_NO_CLASS_NAME = "No classified";

bool machineIsMSBF() {
  const uint16_t aOne = 1;
  uint8_t aFirst = 0;
  std::memcpy(&aFirst, &aOne, 1);
  return aFirst == 0;
}

const CDescriptionField *scalarWithValue(const CDescription &theHeader, const char *theKey) {
  const CDescriptionField *aField = theHeader.findField(theKey);
  if (aField == nullptr || aField->getShape() != CTLRX_DS_SCALAR || !aField->holdsValue())
    return nullptr;
  return aField;
}

// An integer header value read by the header accessors; false when absent
// or not a whole 32-bit number (the caller names the field in its error).
bool integerField(const CDescription &theHeader, const char *theKey, int64_t &theValue) {
  int32_t aValue = 0;
  if (!fdfReadHeaderInteger(theHeader, theKey, aValue).empty())
    return false;
  theValue = aValue;
  return true;
}

// List items of ENVI braces may not hold separators or braces.
std::string listItem(const char *theText) {
  std::string aItem;
  for (const char *aChar = theText; *aChar != '\0'; ++aChar)
    aItem += std::strchr(",{}\r\n", *aChar) != nullptr ? ' ' : *aChar;
  const size_t aFirst = aItem.find_first_not_of(' ');
  if (aFirst == std::string::npos)
    return "";
  return aItem.substr(aFirst, aItem.find_last_not_of(' ') - aFirst + 1);
}

// ------------------------------------------------------------ vocabulary

class CEnviVocabulary {
public:
  CEnviVocabulary(const std::string &theFile, const std::string &theEnviFile)
      : mDescription(std::vector<std::string>{CTLRX_ENVI_SECTION}), mFile(theFile), mEnviFile(theEnviFile) {}

  // False (traced) when the file is missing or cannot be parsed.
  bool load() {
    fdfTraceMessage("read : %s\n", mFile.c_str());
    if (!fdfExistDescriptionFile(mFile.c_str()) || !mDescription.readXML(mFile.c_str(), false)) {
      fdfTraceMessage("SEC_FILE_NOT_FOUND : %s\n", mFile.c_str());
      return false;
    }
    return true;
  }

  // A key word the vocabulary must name.
  std::string key(const char *theField) const {
    const char *aKey = optionalKey(theField);
    if (aKey == nullptr)
      lacks(theField);
    return aKey;
  }
  // A key word that may be left out; nullptr when the vocabulary has none.
  const char *optionalKey(const char *theField) const {
    const CDescriptionField *aField = field(theField);
    if (aField == nullptr || aField->getShape() != CTLRX_DS_SCALAR || aField->getValueType() != CTLRX_DS_STRING ||
        !aField->holdsValue() || *aField->getString() == '\0')
      return nullptr;
    return aField->getString();
  }
  std::string element(const char *theField, int32_t theIndex) const {
    const CDescriptionField *aField = field(theField);
    if (aField == nullptr || aField->getShape() != CTLRX_DS_VECTOR || aField->getValueType() != CTLRX_DS_STRING ||
        !aField->isSet(theIndex) || *aField->getString(theIndex) == '\0')
      TLRX_RAISE_F(CTLRX_ERR_FILE_PARSE, "%s: vocabulary %s has no %s entry %d", mEnviFile.c_str(), mFile.c_str(),
                   theField, theIndex);
    return aField->getString(theIndex);
  }
  int32_t width() const {
    const CDescriptionField *aField = field("WIDTH_CHAR");
    if (aField == nullptr || aField->getShape() != CTLRX_DS_SCALAR || aField->getValueType() != CTLRX_DS_INTEGER ||
        !aField->holdsValue() || aField->getInteger() < 0 || aField->getInteger() > CTLRX_ENVI_MAX_WIDTH)
      lacks("WIDTH_CHAR (0 to 256)");
    return aField->getInteger();
  }

private:
  const CDescriptionField *field(const char *theField) const {
    const CDescriptionSection *aSection = mDescription.findSection(CTLRX_ENVI_SECTION);
    return aSection != nullptr ? aSection->findField(theField) : nullptr;
  }
  [[noreturn]] void lacks(const char *theField) const {
    TLRX_RAISE_F(CTLRX_ERR_FILE_PARSE, "%s: vocabulary %s lacks %s", mEnviFile.c_str(), mFile.c_str(), theField);
  }

  CDescription mDescription;
  std::string mFile;
  std::string mEnviFile;
};

// ----------------------------------------------------------- raster layout

struct SRasterLayout {
  int64_t mPixels = 0;
  int64_t mLines = 0;
  int32_t mCellType = CTLRX_CELL_UNKNOWN;
  int64_t mHeaderOffset = 0;
  int64_t mRowPrefix = 0;
  int64_t mRowSuffix = 0;
  bool mMSBF = false;
};

// The layout fields; a missing or impossible value raises 261121.
SRasterLayout readLayout(const CDescription &theHeader, const std::string &theEnviFile) {
  SRasterLayout aLayout;
  auto aFail = [&](const char *theKey, const char *theWhat) {
    TLRX_RAISE_F(CTLRX_ERR_FILE_PARSE, "%s: %s %s", theEnviFile.c_str(), theKey, theWhat);
  };
  if (!integerField(theHeader, "RasterInfo.NrOfPixelsPerLine", aLayout.mPixels) || aLayout.mPixels < 1)
    aFail("RasterInfo.NrOfPixelsPerLine", "is not a positive number");
  if (!integerField(theHeader, "RasterInfo.NrOfLinesPerImage", aLayout.mLines) || aLayout.mLines < 1)
    aFail("RasterInfo.NrOfLinesPerImage", "is not a positive number");
  const char *aCellType = fdfEnviFieldText(theHeader, "RasterInfo.CellType");
  if (aCellType == nullptr)
    aFail("RasterInfo.CellType", "holds no value");
  aLayout.mCellType = fdfCellTypeFromName(aCellType);
  if (aLayout.mCellType == CTLRX_CELL_UNKNOWN)
    TLRX_RAISE_F(CTLRX_ERR_FILE_PARSE, "%s: unknown cell type %s", theEnviFile.c_str(), aCellType);
  const struct {
    const char *mKey;
    int64_t *mValue;
  } aOffsets[] = {{"RasterInfo.HeaderOffset", &aLayout.mHeaderOffset},
                  {"RasterInfo.RowPrefix", &aLayout.mRowPrefix},
                  {"RasterInfo.RowSuffix", &aLayout.mRowSuffix}};
  for (const auto &aOffset : aOffsets) {
    if (theHeader.findField(aOffset.mKey) != nullptr && theHeader.findField(aOffset.mKey)->holdsValue() &&
        (!integerField(theHeader, aOffset.mKey, *aOffset.mValue) || *aOffset.mValue < 0))
      aFail(aOffset.mKey, "is not a byte count");
  }
  const char *aOrder = fdfEnviFieldText(theHeader, "RasterInfo.BytesOrder");
  aLayout.mMSBF = aOrder != nullptr ? std::strcmp(aOrder, "MSBF") == 0 : machineIsMSBF();
  return aLayout;
}

// Why ENVI cannot describe the layout; empty when it can.
std::string unsupportedLayout(const SRasterLayout &theLayout, const CEnviVocabulary &theVocabulary) {
  if (CTLRX_ENVI_CELLS[theLayout.mCellType].mUnsupported != nullptr)
    return std::string(CTLRX_ENVI_CELLS[theLayout.mCellType].mUnsupported) + " (" +
           fdfCellTypeName(theLayout.mCellType) + ")";
  if (theLayout.mRowPrefix != 0 || theLayout.mRowSuffix != 0)
    return "ENVI has no line prefix or suffix";
  if (theLayout.mHeaderOffset != 0 && theVocabulary.optionalKey("HEADERBYTES_NAME") == nullptr)
    return "the vocabulary has no key word for the header offset";
  return "";
}

// ------------------------------------------------------------- the text

class CEnviText {
public:
  explicit CEnviText(int32_t theWidth) : mWidth(static_cast<size_t>(theWidth)) {}

  // Key word padded to the vocabulary's width, " = ", the value.
  void keyLine(const std::string &theKey, const std::string &theValue) {
    mText.append(theKey);
    if (theKey.size() < mWidth)
      mText.append(mWidth - theKey.size(), ' ');
    mText.append(" = ").append(theValue).append("\n");
  }
  void append(const std::string &theText) { mText.append(theText); }
  const std::string &text() const { return mText; }

private:
  size_t mWidth;
  std::string mText;
};

// Value of the first "RasterInfo.OtherInfo" row whose key begins with theKey.
const char *otherInfo(const CDescription &theHeader, const char *theKey) {
  const CDescriptionField *aTable = theHeader.findField("RasterInfo.OtherInfo");
  if (aTable == nullptr || aTable->getShape() != CTLRX_DS_MATRIX || aTable->getValueType() != CTLRX_DS_STRING ||
      aTable->getColNbr() < 2)
    return nullptr;
  for (int32_t aRow = 0; aRow < aTable->getRowNbr(); ++aRow) {
    if (!aTable->isSet(aRow, 0) || !aTable->isSet(aRow, 1))
      continue;
    const char *aKey = aTable->getString(aRow, 0);
    aKey += std::strspn(aKey, " \t");
    if (std::strncmp(aKey, theKey, std::strlen(theKey)) == 0)
      return aTable->getString(aRow, 1);
  }
  return nullptr;
}

std::string descriptionBlock(const CDescription &theHeader) {
  std::string aTimes;
  for (const SAcquisitionTime &aTime : CTLRX_ENVI_TIMES) {
    const char *aValue = otherInfo(theHeader, aTime.mKey);
    if (aValue == nullptr && aTime.mFallbackKey != nullptr)
      aValue = otherInfo(theHeader, aTime.mFallbackKey);
    if (aValue != nullptr)
      aTimes.append("   ").append(aTime.mLabel).append(listItem(aValue)).append("\n");
  }
  if (aTimes.empty())
    return "ENVI\ndescription = {\n   File Imported into ENVI.}\n";
  return "ENVI\ndescription = {\n" + aTimes + CTLRX_ENVI_GENERATED_TEXT + "\n";
}

// Radar geometry: range and azimuth spacings, the range made ground range
// for slant-range rasters with a known incidence angle.
void appendPixelSize(const CDescription &theHeader, const std::string &theEnviFile, CEnviText &theText) {
  double aRange = 0.0;
  double aAzimuth = 0.0;
  if (!fdfEnviFieldNumber(theHeader, "Processing.PixelSpacingRg", aRange) ||
      !fdfEnviFieldNumber(theHeader, "Processing.PixelSpacingAz", aAzimuth)) {
    fdfTraceMessage("ENVI pixel size not written for %s: no Processing.PixelSpacingRg and PixelSpacingAz\n",
                    theEnviFile.c_str());
    return;
  }
  const char *aGeometry = fdfEnviFieldText(theHeader, "InitialGeometry.Projection");
  double aIncidence = 0.0;
  if (aGeometry != nullptr && std::strcmp(aGeometry, "SLANT_RANGE") == 0 &&
      fdfEnviFieldNumber(theHeader, "ChannelInfo.IncidenceAngle", aIncidence)) {
    if (aIncidence > 0.0 && aIncidence < 90.0)
      aRange /= std::sin(aIncidence * M_PI / 180.0);
    else
      fdfTraceMessage("ENVI pixel size of %s kept in slant range: incidence angle %g\n", theEnviFile.c_str(),
                      aIncidence);
  }
  theText.append("pixel size = {" + fdfEnviDouble(aRange) + ", " + fdfEnviDouble(aAzimuth) + ", units=Meters}\n");
}

// ---------------------------------------------------------- classification

struct SClasses {
  int32_t mCount = 0;
  const CDescriptionField *mNames = nullptr;
  const CDescriptionField *mLut[3] = {nullptr, nullptr, nullptr};
};

const CDescriptionField *vectorWithValue(const CDescription &theHeader, const char *theKey, int32_t theValueType) {
  const CDescriptionField *aField = theHeader.findField(theKey);
  if (aField == nullptr || aField->getShape() != CTLRX_DS_VECTOR || aField->getValueType() != theValueType ||
      !aField->holdsValue())
    return nullptr;
  return aField;
}

// The classes of a CLASSIFICATION raster: one per class name (or per class
// value when the names are missing); the colour table only when all three
// palette vectors cover every class.
SClasses readClasses(const CDescription &theHeader) {
  SClasses aClasses;
  aClasses.mNames = vectorWithValue(theHeader, "RasterInfo.ClassificationName", CTLRX_DS_STRING);
  const CDescriptionField *aData = vectorWithValue(theHeader, "RasterInfo.ClassificationData", CTLRX_DS_INTEGER);
  if (aClasses.mNames != nullptr)
    aClasses.mCount = aClasses.mNames->getColNbr();
  else if (aData != nullptr)
    aClasses.mCount = aData->getColNbr();
  const char *const aLutKeys[3] = {"RasterInfo.TiffLUTRed", "RasterInfo.TiffLUTGreen", "RasterInfo.TiffLUTBlue"};
  for (int i = 0; i < 3; ++i) {
    aClasses.mLut[i] = vectorWithValue(theHeader, aLutKeys[i], CTLRX_DS_INTEGER);
    if (aClasses.mLut[i] == nullptr || aClasses.mLut[i]->getColNbr() < aClasses.mCount) {
      aClasses.mLut[0] = aClasses.mLut[1] = aClasses.mLut[2] = nullptr;
      break;
    }
  }
  return aClasses;
}

// "{", the items separated by ", " with a line break every few items, "}".
std::string braceList(const std::vector<std::string> &theItems) {
  std::string aText = "{\n ";
  for (size_t i = 0; i < theItems.size(); ++i) {
    if (i > 0)
      aText.append(i % CTLRX_ENVI_ITEMS_PER_LINE == 0 ? ",\n " : ", ");
    aText.append(theItems[i]);
  }
  return aText + "}\n";
}

int32_t paletteEntry(const CDescriptionField &theLut, int32_t theClass) {
  const int32_t aValue = theLut.isSet(theClass) ? theLut.getInteger(theClass) : 0;
  return aValue < 0 ? 0 : aValue > 255 ? 255 : aValue;
}

void appendClassification(const SClasses &theClasses, bool theFileTypeWritten, const std::string &theEnviFile,
                          CEnviText &theText) {
  if (!theFileTypeWritten)
    theText.append("file type = ENVI Classification\n");
  theText.append("classes = " + std::to_string(theClasses.mCount) + "\n");
  if (theClasses.mLut[0] != nullptr) {
    std::vector<std::string> aColours;
    for (int32_t i = 0; i < theClasses.mCount; ++i) {
      aColours.push_back(std::to_string(paletteEntry(*theClasses.mLut[0], i)) + ", " +
                         std::to_string(paletteEntry(*theClasses.mLut[1], i)) + ", " +
                         std::to_string(paletteEntry(*theClasses.mLut[2], i)));
    }
    theText.append("class lookup = " + braceList(aColours));
  } else {
    fdfTraceMessage("ENVI class lookup not written for %s: no palette for %d classes\n", theEnviFile.c_str(),
                    theClasses.mCount);
  }
  std::vector<std::string> aNames;
  for (int32_t i = 0; i < theClasses.mCount; ++i) {
    std::string aName;
    if (theClasses.mNames != nullptr && theClasses.mNames->isSet(i))
      aName = listItem(theClasses.mNames->getString(i));
    aNames.push_back(aName.empty() ? CTLRX_ENVI_NO_CLASS_NAME : aName);
  }
  theText.append("class names = " + braceList(aNames));
}

// ---------------------------------------------------------- composition

std::string composeHeader(const CDescription &theHeader, const SRasterLayout &theLayout,
                          const CEnviVocabulary &theVocabulary, const std::string &theEnviFile) {
  const char *aUnits = fdfEnviFieldText(theHeader, "RasterInfo.DataUnits");
  const std::string aDataUnits = aUnits != nullptr ? aUnits : "";
  SClasses aClasses;
  if (aDataUnits == "CLASSIFICATION") {
    aClasses = readClasses(theHeader);
    if (aClasses.mCount == 0)
      fdfTraceMessage("ENVI class lines not written for %s: no ClassificationName or ClassificationData\n",
                      theEnviFile.c_str());
  }
  const bool aClassified = aClasses.mCount > 0;

  CEnviText aText(theVocabulary.width());
  aText.append(descriptionBlock(theHeader));
  aText.keyLine(theVocabulary.key("NCOLS_NAME"), std::to_string(theLayout.mPixels));
  aText.keyLine(theVocabulary.key("NROWS_NAME"), std::to_string(theLayout.mLines));
  aText.keyLine(theVocabulary.key("NBANDS_NAME"), std::to_string(CTLRX_ENVI_CELLS[theLayout.mCellType].mBands));
  if (const char *aKey = theVocabulary.optionalKey("HEADERBYTES_NAME"))
    aText.keyLine(aKey, std::to_string(theLayout.mHeaderOffset));
  const char *aFileTypeKey = theVocabulary.optionalKey("FILE_TYPE_NAME");
  if (aFileTypeKey != nullptr)
    aText.keyLine(aFileTypeKey, aClassified ? "ENVI Classification" : "ENVI Standard");
  if (const char *aKey = theVocabulary.optionalKey("DATATYPE_NAME"))
    aText.keyLine(aKey, theVocabulary.element("DATATYPE_VALS", theLayout.mCellType));
  aText.keyLine(theVocabulary.key("SENSOR_TYPE"), "Unknown");
  aText.keyLine(theVocabulary.key("LAYOUT_NAME"), theVocabulary.element("LAYOUT_VALS", 2));
  aText.keyLine(theVocabulary.key("BYTEORDER_NAME"), theVocabulary.element("BYTEORDER_VALS", theLayout.mMSBF ? 0 : 1));

  if (fdfHasEnviMapPosition(theHeader)) {
    std::string aMapLines;
    fdfAppendEnviMapInfo(theHeader, theEnviFile.c_str(), aMapLines);
    aText.append(aMapLines);
  } else {
    appendPixelSize(theHeader, theEnviFile, aText);
  }
  aText.keyLine(theVocabulary.key("ULXMAP_NAME"), "1");
  aText.keyLine(theVocabulary.key("ULYMAP_NAME"), "1");

  double aNull = 0.0;
  if (theHeader.findSection("RasterInfo") != nullptr &&
      fdfEnviFieldNumber(theHeader, "RasterInfo.NullCellValue", aNull))
    aText.keyLine("Data Ignore Value", fdfEnviDouble(aNull));

  if (aDataUnits == "INTERFEROGRAMME" || aDataUnits == "FLATTENED INTERFEROGRAMME")
    aText.append("complex function = Phase\n");
  else if (aDataUnits == "SLC")
    aText.append("complex function = Magnitude\n");
  else if (aClassified)
    appendClassification(aClasses, aFileTypeKey != nullptr, theEnviFile, aText);
  return aText.text();
}

// Creates theFile with theText; a failed write leaves no file and raises.
void writeWholeFile(const std::string &theFile, const std::string &theText) {
  FILE *aFile = std::fopen(theFile.c_str(), "wb");
  if (aFile == nullptr)
    TLRX_RAISE_F(CTLRX_ERR_FILE_PARSE, "%s: cannot be created (%s)", theFile.c_str(), std::strerror(errno));
  const bool aWritten = std::fwrite(theText.data(), 1, theText.size(), aFile) == theText.size();
  const bool aClosed = std::fclose(aFile) == 0;
  if (!aWritten || !aClosed) {
    const int aError = errno;
    std::remove(theFile.c_str());
    TLRX_RAISE_F(CTLRX_ERR_FILE_PARSE, "%s: cannot be written (%s)", theFile.c_str(), std::strerror(aError));
  }
}

// A skipped raster keeps no ENVI header of an earlier raster of the same name.
bool skipRaster(const std::string &theEnviFile, const std::string &theReason) {
  fdfTraceMessage("ENVI header not written for %s: %s\n", theEnviFile.c_str(), theReason.c_str());
  if (std::remove(theEnviFile.c_str()) == 0)
    fdfTraceMessage("ENVI header of an earlier raster removed: %s\n", theEnviFile.c_str());
  return false;
}

} // namespace

std::string fdfEnviHeaderFileName(const std::string &theName) {
  for (const char *aSuffix : {"_hdr", ".sml"}) {
    if (fdfEndsWithNoCase(theName, aSuffix))
      return theName.substr(0, theName.size() - std::strlen(aSuffix)) + ".hdr";
  }
  return theName + ".hdr";
}

bool fdfIsEnviHeaderExcluded(const std::string &theName) {
  for (const char *aSuffix : CTLRX_ENVI_EXCLUDED_SUFFIXES) {
    if (fdfEndsWithNoCase(theName, aSuffix))
      return true;
  }
  return false;
}

std::string fdfEnviVocabularyFileName(const char *theProfile) {
  const char *aProfile = theProfile != nullptr && *theProfile != '\0' ? theProfile : CTLRX_ENVI_DEFAULT_PROFILE;
  return fdfGetRequiredEnvVar("TELLURIX_CEOS_DES_FILES_DIR") + "ENVI_descriptions_" + aProfile + ".des";
}

std::string fdfEnviDouble(double theValue) {
  if (std::isnan(theValue))
    return "NaN";
  char aText[64];
  std::snprintf(aText, sizeof(aText), "%.30g", theValue);
  return aText;
}

bool fdfEnviFieldNumber(const CDescription &theHeader, const char *theKey, double &theValue) {
  if (!fdfHeaderHolds(theHeader, theKey))
    return false;
  theValue = fdfHeaderReal(theHeader, theKey);
  return true;
}

const char *fdfEnviFieldText(const CDescription &theHeader, const char *theKey) {
  const CDescriptionField *aField = scalarWithValue(theHeader, theKey);
  return aField != nullptr && aField->getValueType() == CTLRX_DS_STRING ? aField->getString() : nullptr;
}

bool fdfWriteEnviHeaderFromDescription(const CDescription &theHeader, const char *theEnviFile,
                                       const char *theProfile) {
  const std::string aEnviFile = theEnviFile != nullptr ? theEnviFile : "";
  CEnviVocabulary aVocabulary(fdfEnviVocabularyFileName(theProfile), aEnviFile);
  const CDescriptionField *aRowPrefix = theHeader.findField("RasterInfo.RowPrefix");
  if (aRowPrefix == nullptr || !aRowPrefix->holdsValue()) {
    fdfTraceMessage("NOT FOUND : %s\n", "RowPrefix");
    return false;
  }
  if (!aVocabulary.load())
    return skipRaster(aEnviFile, "no vocabulary");
  const SRasterLayout aLayout = readLayout(theHeader, aEnviFile);
  const std::string aUnsupported = unsupportedLayout(aLayout, aVocabulary);
  if (!aUnsupported.empty())
    return skipRaster(aEnviFile, aUnsupported);
  writeWholeFile(aEnviFile, composeHeader(theHeader, aLayout, aVocabulary, aEnviFile));
  return true;
}

void fdfWriteRasterHeaderEnvi(const char *theName, const char *theProfile) {
  const std::string aName = theName != nullptr ? theName : "";
  try {
    if (fdfIsEnviHeaderExcluded(aName)) {
      fdfTraceMessage("writeRasterHeaderEnvi NO CREATE ENVI .hdr for : %s\n", aName.c_str());
      return;
    }
    CDescription aHeader;
    fdfDeclareStandardHeader(aHeader);
    if (!aHeader.readFromFile(aName.c_str(), false)) {
      if (aName.find(".shp") != std::string::npos)
        return;
      TLRX_RAISE(CTLRX_ERR_FILE_OPEN, aName.c_str());
    }
    fdfWriteEnviHeaderFromDescription(aHeader, fdfEnviHeaderFileName(aName).c_str(), theProfile);
  } catch (const CErrorExceptionManager &) {
    throw;
  } catch (const std::exception &aError) {
    TLRX_RAISE_F(CTLRX_ERR_UNEXPECTED, "writeRasterHeaderEnvi %s: %s", aName.c_str(), aError.what());
  } catch (...) {
    TLRX_RAISE_F(CTLRX_ERR_UNEXPECTED, "writeRasterHeaderEnvi %s", aName.c_str());
  }
}

void fdfEnviHeaderWriter(const char *theName) { fdfWriteRasterHeaderEnvi(theName, nullptr); }

void fdfInstallEnviHeaderWriter() { fdfSetEnviHeaderWriter(&fdfEnviHeaderWriter); }
