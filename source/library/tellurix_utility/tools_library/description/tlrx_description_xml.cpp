// XML form of descriptions: the exact writer, the section-by-section update
// of an existing file, the reader that maps an element tree onto declared
// fields, the header file names and the values stamped before writing.
#include "tlrx_description_xml.h"
#include "tlrx_header_numbers.h"

#include "tlrx_description_file_lines.h"
#include "tlrx_description_text.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"
#include "tlrx_xml_element_tree.h"

#include <cerrno>
#include <cinttypes>
#include <climits>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <strings.h>
#include <vector>

namespace {

TLRXEnviHeaderWriter sEnviHeaderWriter = nullptr;

bool isVerbose() { return fdfGetDescriptionTraceLevel() > 10 && fdfIsTracing(); }

// ------------------------------------------------------------ writing

// Word of a value type in the element names (VectorDouble, ValueInteger...).
const char *valueTypeWord(int32_t theValueType) {
  switch (theValueType) {
  case CTLRX_DS_INTEGER: return "Integer";
  case CTLRX_DS_DOUBLE: return "Double";
  case CTLRX_DS_STRING: return "String";
  default: return "EFDT";
  }
}

bool isValueType(int32_t theValueType) {
  return theValueType == CTLRX_DS_INTEGER || theValueType == CTLRX_DS_DOUBLE || theValueType == CTLRX_DS_STRING;
}

// Lines of one element, each indented by its level.
class CXmlLines {
public:
  explicit CXmlLines(std::string &theOut) : mOut(theOut) {}

  std::string &open(int theLevel) {
    for (int i = 0; i < theLevel; ++i)
      mOut.append(CTLRX_XML_INDENT_UNIT);
    return mOut;
  }
  void startTag(int theLevel, const std::string &theTagText) { open(theLevel).append("<").append(theTagText).append(">\n"); }
  void endTag(int theLevel, const std::string &theName) { open(theLevel).append("</").append(theName).append(">\n"); }
  // "%s %s = \"%d\"" and "%s %s = \"%d\" %s = \"%d\"" of the tag texts.
  static std::string withAttribute(const std::string &theName, const char *theAttribute, int32_t theValue) {
    return theName + " " + theAttribute + " = \"" + std::to_string(theValue) + "\"";
  }
  static std::string withAttributes(const std::string &theName, const char *theFirst, int32_t theFirstValue,
                                    const char *theSecond, int32_t theSecondValue) {
    return withAttribute(theName, theFirst, theFirstValue) + " " + theSecond + " = \"" +
           std::to_string(theSecondValue) + "\"";
  }
  std::string &out() { return mOut; }

private:
  std::string &mOut;
};

// One cell as element text. False for a value type that has no text.
bool appendXmlValue(std::string &theOut, const CDescriptionField &theField, int32_t theRow, int32_t theCol) {
  switch (theField.getValueType()) {
  case CTLRX_DS_INTEGER: theOut.append(std::to_string(theField.getInteger(theRow, theCol))); return true;
  case CTLRX_DS_DOUBLE: {
    const double aValue = theField.getDouble(theRow, theCol);
    if (std::isnan(aValue)) {
      theOut.append("NaN");
    } else {
      char aText[64];
      std::snprintf(aText, sizeof aText, "%.30g", aValue);
      theOut.append(aText);
    }
    return true;
  }
  case CTLRX_DS_STRING:
    if (theField.isSet(theRow, theCol))
      fdfEscapeXmlText(theField.getString(theRow, theCol), theOut);
    else
      theOut.append("&quot;&quot;");
    return true;
  default: return false;
  }
}

// "<N>value</N>" on one line.
bool appendValueLine(CXmlLines &theLines, int theLevel, const char *theTag, const std::string &theEndTag,
                     const CDescriptionField &theField, int32_t theRow, int32_t theCol) {
  std::string &aOut = theLines.open(theLevel).append("<").append(theTag).append(">");
  if (!appendXmlValue(aOut, theField, theRow, theCol))
    return false;
  aOut.append("</").append(theEndTag).append(">\n");
  return true;
}

bool appendVector(CXmlLines &theLines, int theLevel, const CDescriptionField &theField) {
  const std::string aVector = std::string("Vector") + valueTypeWord(theField.getValueType());
  const std::string aValue = std::string("Value") + valueTypeWord(theField.getValueType());
  const int32_t aCount = theField.getColNbr();
  theLines.startTag(theLevel, CXmlLines::withAttribute(aVector, "NumberOfElements", aCount));
  for (int32_t i = 0; i < aCount; ++i)
    if (!appendValueLine(theLines, theLevel + 1, CXmlLines::withAttribute(aValue, "ID", i).c_str(), aValue, theField,
                         0, i))
      return false;
  theLines.endTag(theLevel, aVector);
  return true;
}

bool appendMatrix(CXmlLines &theLines, int theLevel, const CDescriptionField &theField) {
  const char *aWord = valueTypeWord(theField.getValueType());
  const std::string aMatrix = std::string("Matrix") + aWord;
  const std::string aRow = std::string("MatrixRow") + aWord;
  const std::string aValue = std::string("Value") + aWord;
  const int32_t aRows = theField.getRowNbr(), aCols = theField.getColNbr();
  theLines.startTag(theLevel, CXmlLines::withAttributes(aMatrix, "NumberOfRows", aRows, "NumberOfColumns", aCols));
  for (int32_t r = 0; r < aRows; ++r) {
    theLines.startTag(theLevel + 1, CXmlLines::withAttribute(aRow, "ID", r));
    for (int32_t c = 0; c < aCols; ++c)
      if (!appendValueLine(theLines, theLevel + 2, CXmlLines::withAttribute(aValue, "ID", c).c_str(), aValue,
                           theField, r, c))
        return false;
    theLines.endTag(theLevel + 1, aRow);
  }
  theLines.endTag(theLevel, aMatrix);
  return true;
}

// Members of a struct, all of one shape; vectors also of one length.
bool collectMembers(const CDescriptionField &theStruct, int32_t theShape,
                    std::vector<const CDescriptionField *> &theMembers) {
  const int32_t aCount = theStruct.getMemberCount();
  for (int32_t i = 0; i < aCount; ++i) {
    const CDescriptionField *aMember = theStruct.getMember(i);
    if (aMember == nullptr || aMember->getShape() != theShape || !isValueType(aMember->getValueType()))
      return false;
    if (theShape == CTLRX_DS_VECTOR && (aMember->getRowNbr() != 1 || aMember->getColNbr() != theStruct.getNumberOfElements()))
      return false;
    theMembers.push_back(aMember);
  }
  return !theMembers.empty();
}

bool appendStructOfVectors(CXmlLines &theLines, int theLevel, const CDescriptionField &theField,
                           const std::vector<const CDescriptionField *> &theMembers) {
  const std::string aName = theField.getName();
  const std::string aOuter = "VectorOfStructs_" + aName;
  const std::string aItem = "VectorOfStructsValues_" + aName;
  const int32_t aCount = theField.getNumberOfElements();
  theLines.startTag(theLevel, CXmlLines::withAttributes(aOuter, "NumberOfElements", aCount, "NumberOfFields",
                                                        static_cast<int32_t>(theMembers.size())));
  for (int32_t i = 0; i < aCount; ++i) {
    theLines.startTag(theLevel + 1, CXmlLines::withAttribute(aItem, "ID", i));
    for (const CDescriptionField *aMember : theMembers)
      if (!appendValueLine(theLines, theLevel + 2, aMember->getName(), aMember->getName(), *aMember, 0, i))
        return false;
    theLines.endTag(theLevel + 1, aItem);
  }
  theLines.endTag(theLevel, aOuter);
  return true;
}

bool appendStructOfScalars(CXmlLines &theLines, int theLevel, const CDescriptionField &theField,
                           const std::vector<const CDescriptionField *> &theMembers) {
  const std::string aOuter = std::string("Struct_") + theField.getName();
  theLines.startTag(theLevel, CXmlLines::withAttribute(aOuter, "NumberOfFields", static_cast<int32_t>(theMembers.size())));
  for (const CDescriptionField *aMember : theMembers)
    if (!appendValueLine(theLines, theLevel + 1, aMember->getName(), aMember->getName(), *aMember, 0, 0))
      return false;
  theLines.endTag(theLevel, aOuter);
  return true;
}

// One field holding a value, from level theLevel. False when its shape or
// value type has no written form (a struct of matrices, members of unequal
// lengths, an unknown value type).
bool appendField(CXmlLines &theLines, int theLevel, const CDescriptionField &theField) {
  const std::string aName = theField.getName();
  const int32_t aShape = theField.getShape();
  if (aShape == CTLRX_DS_SCALAR)
    return appendValueLine(theLines, theLevel, aName.c_str(), aName, theField, 0, 0);
  if (aShape != CTLRX_DS_VECTOR && aShape != CTLRX_DS_MATRIX && aShape != CTLRX_DS_MULTIPLE)
    return false;
  if (aShape != CTLRX_DS_MULTIPLE && !isValueType(theField.getValueType()))
    return false;
  theLines.startTag(theLevel, aName);
  bool aWritten = false;
  if (aShape == CTLRX_DS_VECTOR) {
    aWritten = appendVector(theLines, theLevel + 1, theField);
  } else if (aShape == CTLRX_DS_MATRIX) {
    aWritten = appendMatrix(theLines, theLevel + 1, theField);
  } else {
    const CDescriptionField *aFirst = theField.getMember(0);
    std::vector<const CDescriptionField *> aMembers;
    const int32_t aMemberShape = aFirst != nullptr ? aFirst->getShape() : CTLRX_DS_UNRECOGNISED;
    if (aMemberShape == CTLRX_DS_VECTOR && collectMembers(theField, aMemberShape, aMembers))
      aWritten = appendStructOfVectors(theLines, theLevel + 1, theField, aMembers);
    else if (aMemberShape == CTLRX_DS_SCALAR && collectMembers(theField, aMemberShape, aMembers))
      aWritten = appendStructOfScalars(theLines, theLevel + 1, theField, aMembers);
  }
  if (!aWritten)
    return false;
  theLines.endTag(theLevel, aName);
  return true;
}

// The section's element (level 1); theOut is untouched when it fails.
bool appendSection(std::string &theOut, const CDescriptionSection &theSection) {
  std::string aText;
  CXmlLines aLines(aText);
  aLines.startTag(1, theSection.getName());
  for (int32_t i = 0; i < theSection.getFieldCount(); ++i) {
    const CDescriptionField *aField = theSection.getField(i);
    if (aField == nullptr || aField->getParentIndex() != -1 || !aField->holdsValue())
      continue;
    if (!appendField(aLines, 2, *aField)) {
      fdfTraceMessage("\nfield [%s] of section [%s] has no written form\n", aField->getName(), theSection.getName());
      return false;
    }
  }
  aLines.endTag(1, theSection.getName());
  theOut.append(aText);
  return true;
}

void appendRootStart(std::string &theOut, const std::string &theRootTag) {
  std::string aTag = theRootTag;
  if (theRootTag.find(CTLRX_DS_DEFAULT_ROOT_TAG) != std::string::npos) {
    aTag.append(" xmlns=\"").append(CTLRX_HEADER_NAMESPACE_URI).append("\"");
    aTag.append("\n\txmlns:xsi=\"").append(CTLRX_XSI_NAMESPACE_URI).append("\"");
    aTag.append("\n\txsi:schemaLocation=\"").append(CTLRX_HEADER_NAMESPACE_URI);
    aTag.append("\n\t").append(CTLRX_HEADER_NAMESPACE_URI).append("/").append(CTLRX_HEADER_SCHEMA_FILE).append("\"");
  }
  CXmlLines(theOut).startTag(0, aTag);
}

// The section element "<E>" alone on its line opens the block; nested
// elements of the same name are counted so the matching end tag closes it.
class CXmlSectionBlock : public CSectionBlockFinder {
public:
  CXmlSectionBlock(const std::string &theSection, const std::string &theRoot)
      : mStart("<" + theSection + ">"), mEnd("</" + theSection + ">"), mRootEnd("</" + theRoot + ">") {}
  bool opensBlock(std::string_view theLine) override {
    mDepth = fdfTrimLine(theLine) == mStart ? 1 : 0;
    return mDepth == 1;
  }
  EInside inside(std::string_view theLine) override {
    const std::string_view aLine = fdfTrimLine(theLine);
    if (aLine == mStart)
      ++mDepth;
    else if (aLine == mEnd && --mDepth == 0)
      return EInside::endsWith;
    return EInside::continues;
  }
  bool closedByEndOfFile() const override { return false; }
  bool isInsertionLine(std::string_view theLine) override { return theLine.find(mRootEnd) != std::string_view::npos; }
  bool insertsAtEnd() const override { return false; }

private:
  std::string mStart, mEnd, mRootEnd;
  int mDepth = 0;
};

void traceKeptLines(const STLRXSplitFile &theSplit) {
  for (const std::string *aPart : {&theSplit.mBefore, &theSplit.mAfter}) {
    size_t aBegin = 0;
    while (aBegin < aPart->size()) {
      size_t aEnd = aPart->find('\n', aBegin);
      aEnd = aEnd == std::string::npos ? aPart->size() : aEnd + 1;
      fdfTraceMessage("WRITE %.*s", static_cast<int>(aEnd - aBegin), aPart->data() + aBegin);
      aBegin = aEnd;
    }
  }
}

// Replaces (or inserts) one section's element in an existing file.
bool updateSectionInFile(const char *theFile, const CDescriptionSection &theSection, const std::string &theRootTag) {
  CXmlSectionBlock aFinder(theSection.getName(), theRootTag);
  STLRXSplitFile aSplit;
  if (!fdfSplitFileAroundBlock(theFile, CTLRX_XML_MAX_LINE, aFinder, aSplit))
    return false;
  if (isVerbose()) {
    fdfTraceMessage("flocal_readOtherSectionFromFile = %s\nSectionName = %s\naLine = %ld\naLinePos = %ld\n", theFile,
                    theSection.getName(), aSplit.mKeptLines, aSplit.mRemovalLine);
    traceKeptLines(aSplit);
  }
  std::string aContent = std::move(aSplit.mBefore);
  if (!appendSection(aContent, theSection))
    return false;
  aContent.append(aSplit.mAfter);
  return fdfReplaceFile(theFile, aContent);
}

// ------------------------------------------------------------ reading

// A count attribute: decimal digits (blanks around allowed), 0 to INT32_MAX.
bool parseCount(const char *theText, int32_t &theCount) {
  if (theText == nullptr)
    return false;
  while (*theText == ' ' || *theText == '\t')
    ++theText;
  long long aValue = 0;
  const char *aDigit = theText;
  for (; *aDigit >= '0' && *aDigit <= '9'; ++aDigit) {
    aValue = aValue * 10 + (*aDigit - '0');
    if (aValue > INT32_MAX)
      return false;
  }
  if (aDigit == theText)
    return false;
  while (*aDigit == ' ' || *aDigit == '\t')
    ++aDigit;
  if (*aDigit != '\0')
    return false;
  theCount = static_cast<int32_t>(aValue);
  return true;
}

std::vector<const CXmlElement *> childrenWithPrefix(const CXmlElement &theElement, const char *thePrefix) {
  std::vector<const CXmlElement *> aChildren;
  const size_t aLength = std::strlen(thePrefix);
  for (const CXmlElement *aChild : theElement.getChildren())
    if (aChild->getName().compare(0, aLength, thePrefix) == 0)
      aChildren.push_back(aChild);
  return aChildren;
}

// Maps one element tree part onto the fields of a section. Counts in the
// file are checked against the elements actually present before anything
// is allocated; a disagreement makes the mapping fail.
class CSectionMapper {
public:
  explicit CSectionMapper(const char *theFile) : mFile(theFile) {}

  bool map(const CXmlElement &theElement, CDescriptionSection &theSection) {
    for (int32_t i = 0; i < theSection.getFieldCount(); ++i) {
      CDescriptionField *aField = theSection.getField(i);
      const CXmlElement *aElement = aField != nullptr ? theElement.findChild(aField->getName()) : nullptr;
      if (aElement != nullptr && !mapField(*aElement, *aField))
        return false;
    }
    return true;
  }

private:
  bool mapField(const CXmlElement &theElement, CDescriptionField &theField) {
    switch (theField.getShape()) {
    case CTLRX_DS_SCALAR: setCell(theField, 0, 0, theElement); return true;
    case CTLRX_DS_VECTOR: return mapVector(theElement, theField);
    case CTLRX_DS_MATRIX: return mapMatrix(theElement, theField);
    case CTLRX_DS_MULTIPLE: return mapStruct(theElement, theField);
    default: unusable(theField);
    }
  }

  [[noreturn]] void unusable(const CDescriptionField &theField) {
    theField.dump();
    TLRX_RAISE(CTLRX_ERR_DS_TYPE, theField.getName());
  }
  [[noreturn]] void missing(const CDescriptionField &theField) {
    theField.dump();
    TLRX_RAISE(CTLRX_ERR_DS_FIELD_MISSING, theField.getName());
  }
  const CXmlElement &container(const CXmlElement &theElement, const CDescriptionField &theField,
                               const std::string &theName) {
    const CXmlElement *aContainer = theElement.findChild(theName.c_str());
    if (aContainer == nullptr)
      missing(theField);
    return *aContainer;
  }
  bool badCount(const CDescriptionField &theField, const char *theAttribute, const char *theText, size_t thePresent) {
    fdfTraceMessage("\n%s : field [%s] declares %s = \"%s\" but holds %zu\n", mFile, theField.getName(), theAttribute,
                    theText != nullptr ? theText : "(none)", thePresent);
    return false;
  }

  void setCell(CDescriptionField &theField, int32_t theRow, int32_t theCol, const CXmlElement &theElement) {
    const int32_t aType = theField.getValueType();
    if (aType == CTLRX_DS_STRING) {
      // An element without text is an empty string (what the writer makes of one).
      mText.clear();
      fdfRestoreXmlText(theElement.getText().data(), theElement.getText().size(), mText);
      theField.setString(theRow, theCol, mText.c_str());
      return;
    }
    if (!theElement.hasText())
      missing(theField);
    mText.clear();
    fdfRestoreXmlText(theElement.getText().data(), theElement.getText().size(), mText);
    if (!fdfSetNumberFromText(theField, theRow, theCol, mText.c_str())) {
      if (isVerbose())
        fdfTraceMessage("Data Type ID :%d\n", aType);
      unusable(theField);
    }
  }

  bool mapVector(const CXmlElement &theElement, CDescriptionField &theField) {
    if (!isValueType(theField.getValueType()))
      unusable(theField);
    const CXmlElement &aVector =
        container(theElement, theField, std::string("Vector") + valueTypeWord(theField.getValueType()));
    const std::vector<const CXmlElement *> aValues = childrenWithPrefix(aVector, "Value");
    const char *aText = aVector.getAttribute("NumberOfElements");
    int32_t aCount = 0;
    if (!parseCount(aText, aCount) || static_cast<size_t>(aCount) != aValues.size())
      return badCount(theField, "NumberOfElements", aText, aValues.size());
    theField.allocate(1, aCount);
    for (int32_t i = 0; i < aCount; ++i)
      setCell(theField, 0, i, *aValues[static_cast<size_t>(i)]);
    return true;
  }

  bool mapMatrix(const CXmlElement &theElement, CDescriptionField &theField) {
    if (!isValueType(theField.getValueType()))
      unusable(theField);
    const CXmlElement &aMatrix =
        container(theElement, theField, std::string("Matrix") + valueTypeWord(theField.getValueType()));
    const std::vector<const CXmlElement *> aRowElements = childrenWithPrefix(aMatrix, "MatrixRow");
    const char *aRowText = aMatrix.getAttribute("NumberOfRows");
    const char *aColText = aMatrix.getAttribute("NumberOfColumns");
    int32_t aRows = 0, aCols = 0;
    if (!parseCount(aRowText, aRows) || static_cast<size_t>(aRows) != aRowElements.size())
      return badCount(theField, "NumberOfRows", aRowText, aRowElements.size());
    if (!parseCount(aColText, aCols) || (aRows == 0 && aCols != 0))
      return badCount(theField, "NumberOfColumns", aColText, 0);
    std::vector<std::vector<const CXmlElement *>> aCells;
    aCells.reserve(aRowElements.size());
    for (const CXmlElement *aRow : aRowElements) {
      aCells.push_back(childrenWithPrefix(*aRow, "Value"));
      if (aCells.back().size() != static_cast<size_t>(aCols))
        return badCount(theField, "NumberOfColumns", aColText, aCells.back().size());
    }
    theField.allocate(aRows, aCols);
    for (int32_t r = 0; r < aRows; ++r)
      for (int32_t c = 0; c < aCols; ++c)
        setCell(theField, r, c, *aCells[static_cast<size_t>(r)][static_cast<size_t>(c)]);
    return true;
  }

  bool mapStruct(const CXmlElement &theElement, CDescriptionField &theField) {
    const CDescriptionField *aFirst = theField.getMember(0);
    if (aFirst == nullptr)
      return true; // a struct without members has nothing to take
    const std::string aName = theField.getName();
    if (aFirst->getShape() == CTLRX_DS_SCALAR) {
      const CXmlElement &aStruct = container(theElement, theField, "Struct_" + aName);
      for (int32_t m = 0; m < theField.getMemberCount(); ++m) {
        CDescriptionField *aMember = theField.getMember(m);
        if (aMember == nullptr || aMember->getShape() != CTLRX_DS_SCALAR)
          unusable(theField);
        const CXmlElement *aValue = aStruct.findChild(aMember->getName());
        if (aValue == nullptr)
          missing(*aMember);
        setCell(*aMember, 0, 0, *aValue);
      }
      return true;
    }
    if (aFirst->getShape() != CTLRX_DS_VECTOR)
      unusable(theField);
    const CXmlElement &aOuter = container(theElement, theField, "VectorOfStructs_" + aName);
    const std::vector<const CXmlElement *> aItems = childrenWithPrefix(aOuter, "VectorOfStructsValues");
    const char *aText = aOuter.getAttribute("NumberOfElements");
    int32_t aCount = 0;
    if (!parseCount(aText, aCount) || static_cast<size_t>(aCount) != aItems.size())
      return badCount(theField, "NumberOfElements", aText, aItems.size());
    theField.setNumberOfElements(aCount);
    for (int32_t m = 0; m < theField.getMemberCount(); ++m) {
      CDescriptionField *aMember = theField.getMember(m);
      for (int32_t i = 0; i < aCount; ++i) {
        const CXmlElement *aValue = aItems[static_cast<size_t>(i)]->findChild(aMember->getName());
        if (aValue == nullptr)
          missing(*aMember);
        setCell(*aMember, 0, i, *aValue);
      }
    }
    return true;
  }

  const char *mFile;
  std::string mText; // reused for every restored string
};

// ------------------------------------------------------------ values

CDescriptionField *findScalar(const CDescription &theDescription, const char *theKey) {
  CDescriptionField *aField = theDescription.findField(theKey);
  return aField != nullptr && aField->getShape() == CTLRX_DS_SCALAR ? aField : nullptr;
}

void setNumber(const CDescription &theDescription, const char *theKey, double theValue) {
  CDescriptionField *aField = findScalar(theDescription, theKey);
  if (aField == nullptr)
    return;
  if (aField->getValueType() == CTLRX_DS_DOUBLE)
    aField->setDouble(theValue);
  else if (aField->getValueType() == CTLRX_DS_INTEGER)
    aField->setInteger(static_cast<int32_t>(std::lround(theValue)));
}

bool startsWithXml(const char *theFile) {
  FILE *aFile = fdfIsRegularFile(theFile) ? std::fopen(theFile, "rb") : nullptr;
  if (aFile == nullptr)
    return false;
  int aChar = 0;
  while ((aChar = std::getc(aFile)) != EOF && (aChar == ' ' || aChar == '\t' || aChar == '\r' || aChar == '\n' ||
                                              aChar == 0xEF || aChar == 0xBB || aChar == 0xBF)) {
  }
  std::fclose(aFile);
  return aChar == '<';
}

// The failing section's name goes to theMissing.
bool readTextForm(CDescription &theDescription, const char *theFile, bool theMustExist, std::string &theMissing) {
  theDescription.clearValues();
  for (int32_t i = 0; i < theDescription.getSectionCount(); ++i) {
    CDescriptionSection *aSection = theDescription.getSection(i);
    if (fdfReadTextSection(*aSection, theFile))
      continue;
    theMissing = aSection->getName();
    fdfTraceMessage(" Not Found : %s\n", aSection->getName());
    if (theMustExist) {
      theDescription.print(true);
      TLRX_RAISE(CTLRX_ERR_FILE_OPEN, theFile);
    }
    return false;
  }
  return true;
}

} // namespace

// ================================================================ names

bool fdfEndsWithNoCase(const std::string &theText, const char *theSuffix) {
  const size_t aLength = std::strlen(theSuffix);
  return theText.size() >= aLength && strcasecmp(theText.c_str() + theText.size() - aLength, theSuffix) == 0;
}

std::string fdfHeaderFileName(const std::string &theName) {
  static const char *const aHeaderSuffixes[] = {"_hdr", ".sml", "_par", "_map", ".orb", "_orb_hdr"};
  for (const char *aSuffix : aHeaderSuffixes)
    if (fdfEndsWithNoCase(theName, aSuffix))
      return theName;
  return theName + "_hdr";
}

std::string fdfXmlHeaderFileName(const std::string &theHeaderName) {
  std::string aName = theHeaderName;
  for (const char *aSuffix : {"_hdr", ".sml"})
    if (fdfEndsWithNoCase(aName, aSuffix))
      aName.resize(aName.size() - std::strlen(aSuffix));
  return aName + ".sml";
}

std::string fdfTextHeaderFileName(const std::string &theName) {
  const std::string aHeader = fdfHeaderFileName(theName);
  if (!fdfEndsWithNoCase(aHeader, ".sml"))
    return aHeader;
  return aHeader.substr(0, aHeader.size() - 4) + "_hdr";
}

// ================================================================ values

void fdfStampOtherInfo(CDescription &theDescription, const char *theKey, const char *theValue) {
  CDescriptionField *aTable = theDescription.findField("RasterInfo.OtherInfo");
  if (aTable == nullptr || aTable->getShape() != CTLRX_DS_MATRIX || aTable->getValueType() != CTLRX_DS_STRING)
    return;
  std::string aValue = theValue != nullptr ? theValue : "";
  for (char &aChar : aValue)
    aChar = aChar == '\n' ? ' ' : aChar == '=' ? ':' : aChar;
  const int32_t aRows = aTable->holdsValue() ? aTable->getRowNbr() : 0;
  const int32_t aCols = aRows > 0 ? aTable->getColNbr() : 2;
  if (aCols < 2)
    return; // not a key/value table
  const size_t aKeyLength = std::strlen(theKey);
  for (int32_t r = 0; r < aRows; ++r) {
    if (aTable->isSet(r, 0) && std::strncmp(aTable->getString(r, 0), theKey, aKeyLength) == 0) {
      aTable->setString(r, 1, aValue.c_str());
      return;
    }
  }
  // Append a row: keep the set cells across the reallocation.
  std::vector<std::pair<bool, std::string>> aCells;
  aCells.reserve(static_cast<size_t>(aRows) * static_cast<size_t>(aCols));
  for (int32_t r = 0; r < aRows; ++r)
    for (int32_t c = 0; c < aCols; ++c)
      aCells.emplace_back(aTable->isSet(r, c), aTable->isSet(r, c) ? aTable->getString(r, c) : "");
  aTable->allocate(aRows + 1, aCols);
  for (size_t i = 0; i < aCells.size(); ++i)
    if (aCells[i].first)
      aTable->setString(static_cast<int32_t>(i) / aCols, static_cast<int32_t>(i) % aCols, aCells[i].second.c_str());
  aTable->setString(aRows, 0, theKey);
  aTable->setString(aRows, 1, aValue.c_str());
}

void fdfStampSoftware(CDescription &theDescription) {
  fdfStampOtherInfo(theDescription, CTLRX_SOFTWARE_KEY, fdfGetBanner());
}

bool fdfDeriveDemBox(CDescription &theDescription) {
  if (theDescription.findSection("RasterInfo") == nullptr ||
      theDescription.findSection("RegistrationCoordinates") == nullptr ||
      theDescription.findSection("DEMCoordinates") == nullptr)
    return false;
  const CDescriptionField *aGeocoded = findScalar(theDescription, "RasterInfo.GeocodedImage");
  if (aGeocoded == nullptr || aGeocoded->getValueType() != CTLRX_DS_STRING || !aGeocoded->holdsValue() ||
      strcasecmp(aGeocoded->getString(), "OK") != 0)
    return false;
  SMapRegistration aMap;
  std::string aKey, aProblem;
  int32_t aLines = 0, aPixels = 0;
  if (!fdfReadMapRegistration(theDescription, aMap, aKey, aProblem) ||
      !fdfReadHeaderInteger(theDescription, "RasterInfo.NrOfLinesPerImage", aLines).empty() ||
      !fdfReadHeaderInteger(theDescription, "RasterInfo.NrOfPixelsPerLine", aPixels).empty())
    return false;
  setNumber(theDescription, "DEMCoordinates.NorthingCoordinateBegin", aMap.mNorthing + aLines * aMap.mNorthSpacing);
  setNumber(theDescription, "DEMCoordinates.NorthingGridSize", -aMap.mNorthSpacing);
  setNumber(theDescription, "DEMCoordinates.NorthingCoordinateEnd", aMap.mNorthing);
  setNumber(theDescription, "DEMCoordinates.EastingCoordinateBegin", aMap.mEasting);
  setNumber(theDescription, "DEMCoordinates.EastingGridSize", aMap.mEastSpacing);
  setNumber(theDescription, "DEMCoordinates.EastingCoordinateEnd", aMap.mEasting + aPixels * aMap.mEastSpacing);
  return true;
}

TLRXEnviHeaderWriter fdfSetEnviHeaderWriter(TLRXEnviHeaderWriter theWriter) {
  const TLRXEnviHeaderWriter aPrevious = sEnviHeaderWriter;
  sEnviHeaderWriter = theWriter;
  return aPrevious;
}

TLRXEnviHeaderWriter fdfGetEnviHeaderWriter() { return sEnviHeaderWriter; }

// ============================================================ XML files

bool CDescription::writeXML(const char *theFileName, bool theFresh, bool theRaise) {
  const bool aUpdate = !theFresh && fdfExistDescriptionFile(theFileName);
  if (findSection("RasterInfo") != nullptr)
    fdfStampSoftware(*this);
  std::string aContent;
  if (!aUpdate) {
    aContent.append(CTLRX_XML_DECLARATION).append("\n");
    appendRootStart(aContent, mRootTag);
  }
  bool aAllWritten = true;
  for (int32_t i = 0; i < getSectionCount(); ++i) {
    const CDescriptionSection &aSection = *getSection(i);
    if (!aSection.holdsValue()) {
      fdfTraceMessage("%s IS_EMPTY\n", aSection.getName());
      continue;
    }
    const bool aWritten = aUpdate ? updateSectionInFile(theFileName, aSection, mRootTag)
                                  : appendSection(aContent, aSection);
    if (isVerbose())
      fdfTraceMessage("writeXML %s\n", aSection.getName());
    if (!aWritten) {
      if (theRaise)
        TLRX_RAISE_F(CTLRX_ERR_FILE_WRITE, "%s : %s", theFileName, aSection.getName());
      aAllWritten = false;
    }
  }
  if (aUpdate)
    return aAllWritten;
  CXmlLines(aContent).endTag(0, mRootTag);
  if (!fdfReplaceFile(theFileName, aContent)) {
    if (theRaise)
      TLRX_RAISE(CTLRX_ERR_FILE_WRITE, theFileName);
    return false;
  }
  return aAllWritten;
}

bool CDescription::readXML(const char *theFileName, bool theRaiseIfMissing) {
  if (isVerbose())
    fdfTraceMessage("before ftlrx_xml_parser : %s\n", theFileName);
  CXmlElementTree aTree;
  const bool aParsed = aTree.parseFile(theFileName, CTLRX_XML_MAX_LINE);
  if (isVerbose())
    fdfTraceMessage("after ftlrx_xml_parser : %s\n", theFileName);
  mReadError.clear();
  if (!aParsed) {
    mReadError = aTree.getErrorText();
    if (theRaiseIfMissing)
      TLRX_RAISE(CTLRX_ERR_FILE_PARSE, theFileName);
    return false;
  }
  clearValues();
  const CXmlElement *aRoot = aTree.getRoot();
  if (aRoot == nullptr || aRoot->getName() != mRootTag) {
    fdfTraceMessage("NOT FOUND this->mInitialTag : %s\n", mRootTag.c_str());
    mReadError = "no root element " + mRootTag + " in " + theFileName;
    return false;
  }
  CSectionMapper aMapper(theFileName);
  for (int32_t i = 0; i < getSectionCount(); ++i) {
    CDescriptionSection &aSection = *getSection(i);
    const CXmlElement *aElement = aRoot->findChild(aSection.getName());
    if (aElement != nullptr && !aMapper.map(*aElement, aSection)) {
      mReadError = std::string("counts of section ") + aSection.getName() + " disagree with its elements in " +
                   theFileName;
      if (theRaiseIfMissing)
        TLRX_RAISE(CTLRX_ERR_FILE_PARSE, theFileName);
      return false;
    }
  }
  return true;
}

bool fdfReadXMLSection(CDescriptionSection &theSection, const char *theFile, bool theRaise) {
  if (isVerbose())
    fdfTraceMessage("readFromXMLFile : %s\n", theFile);
  CXmlElementTree aTree;
  if (!aTree.parseFile(theFile, CTLRX_XML_SECTION_MAX_LINE)) {
    if (theRaise)
      TLRX_RAISE(CTLRX_ERR_FILE_PARSE, theFile);
    return false;
  }
  const CXmlElement *aRoot = aTree.getRoot();
  if (aRoot == nullptr || aRoot->getName() != theSection.getRootTag())
    return false;
  std::vector<const CXmlElement *> aSections;
  for (const CXmlElement *aChild : aRoot->getChildren())
    if (aChild->getName() == "SECTION")
      aSections.push_back(aChild);
  int32_t aSectionNbr = 0;
  const bool aCounted = parseCount(aRoot->getAttribute("NumberOfElements"), aSectionNbr);
  if (isVerbose())
    fdfTraceMessage("aSectionNbr = %d\n", aSectionNbr);
  if (!aCounted || static_cast<size_t>(aSectionNbr) != aSections.size()) {
    fdfTraceMessage("\n%s : NumberOfElements disagrees with %zu SECTION elements\n", theFile, aSections.size());
    return false;
  }
  const size_t aNameLength = std::strlen(theSection.getName());
  for (const CXmlElement *aElement : aSections) {
    const char *aName = aElement->getAttribute("NAME");
    if (aName == nullptr || std::strncmp(aName, theSection.getName(), aNameLength) != 0)
      continue;
    theSection.clearValues();
    return CSectionMapper(theFile).map(*aElement, theSection);
  }
  return false;
}

// ======================================================== header files

bool CDescription::readFromFile(const char *theName, bool theMustExist) {
  const std::string aHeader = fdfHeaderFileName(theName != nullptr ? theName : "");
  const std::string aXml = fdfXmlHeaderFileName(aHeader);
  mReadError.clear();
  bool aRead = false;
  if (fdfExistDescriptionFile(aXml.c_str())) {
    aRead = readXML(aXml.c_str(), false);
  } else if (fdfExistDescriptionFile(aHeader.c_str())) {
    // "_hdr" files hold either form.
    std::string aMissing;
    aRead = (startsWithXml(aHeader.c_str()) && readXML(aHeader.c_str(), false)) ||
            readTextForm(*this, aHeader.c_str(), theMustExist, aMissing);
    if (aRead)
      mReadError.clear();
    else if (mReadError.empty())
      mReadError = fdfIsRegularFile(aHeader.c_str()) ? "section " + aMissing + " not found in " + aHeader
                                                      : aHeader + " is not a regular file";
  } else {
    if (isVerbose())
      fdfTraceMessage(" Not Found\n");
    fdfLogMessage("\nFile : %s Not Found\n\n", aHeader.c_str());
  }
  errno = 0;
  return aRead;
}

bool CDescription::writeToFile(const char *theName, bool theAlsoText, bool theRaise) {
  fdfDeriveDemBox(*this);
  const std::string aName = theName != nullptr ? theName : "";
  const bool aWritten = writeXML(fdfXmlHeaderFileName(fdfHeaderFileName(aName)).c_str(), true, false);
  if (theAlsoText) {
    if (findSection("RasterInfo") != nullptr)
      fdfStampSoftware(*this);
    const std::string aText = fdfTextHeaderFileName(aName);
    for (int32_t i = 0; i < getSectionCount(); ++i) {
      if (fdfWriteTextSection(*getSection(i), aText.c_str()) || !theRaise)
        continue;
      print(true);
      TLRX_RAISE(CTLRX_ERR_FILE_WRITE, aText.c_str());
    }
  }
  // The ENVI header is built from the header just written: without it there
  // is nothing to describe, and the caller reports the failed write.
  if (aWritten && sEnviHeaderWriter != nullptr)
    sEnviHeaderWriter(aName.c_str());
  return aWritten;
}
