// Text form of descriptions: reading one section's block and rewriting a
// file with one section's block replaced.
#include "tlrx_description_text.h"

#include "tlrx_description_file_lines.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"
#include "tlrx_xml_element_tree.h"

#include <climits>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

namespace {

struct SFileCloser {
  void operator()(FILE *theFile) const { std::fclose(theFile); }
};
using CFilePtr = std::unique_ptr<FILE, SFileCloser>;

bool isDelimiter(char theChar) { return theChar == ' ' || theChar == '\t' || theChar == '\r' || theChar == '\n'; }

// Everything before the first line feed or carriage return.
std::string_view cutLine(std::string_view theLine) {
  const size_t aEnd = theLine.find_first_of("\r\n");
  return aEnd == std::string_view::npos ? theLine : theLine.substr(0, aEnd);
}

// First token of theText, delimited by any character of theDelimiters.
std::string_view firstToken(std::string_view theText, const char *theDelimiters) {
  const size_t aBegin = theText.find_first_not_of(theDelimiters);
  if (aBegin == std::string_view::npos)
    return {};
  const size_t aEnd = theText.find_first_of(theDelimiters, aBegin);
  return theText.substr(aBegin, aEnd == std::string_view::npos ? std::string_view::npos : aEnd - aBegin);
}

// A section header line: "[" in the first or second character.
bool isHeaderLine(std::string_view theLine) {
  return (!theLine.empty() && theLine[0] == '[') || (theLine.size() > 1 && theLine[1] == '[');
}

std::string_view headerName(std::string_view theLine) { return firstToken(theLine, "\t []"); }

// ------------------------------------------------------------ reading

// The groups of a "{...}" value: flat tokens, or one group per "{...}".
struct SBraceValue {
  std::vector<std::string_view> mFlat;
  std::vector<std::vector<std::string_view>> mGroups;
};

class CBraceParser {
public:
  CBraceParser(std::string_view theText, bool theQuoted) : mText(theText), mQuoted(theQuoted) {}

  // theText must start with "{" (after blanks). False when it does not, or
  // when flat tokens and groups are mixed.
  bool parse(SBraceValue &theValue) {
    skipDelimiters();
    if (mPos >= mText.size() || mText[mPos] != '{')
      return false;
    ++mPos;
    for (;;) {
      skipDelimiters();
      if (mPos >= mText.size() || mText[mPos] == '}')
        break;
      if (mText[mPos] == '{') {
        ++mPos;
        theValue.mGroups.emplace_back();
        readTokens(theValue.mGroups.back());
      } else {
        theValue.mFlat.push_back(token());
      }
    }
    return theValue.mFlat.empty() || theValue.mGroups.empty();
  }

private:
  void skipDelimiters() {
    while (mPos < mText.size() && isDelimiter(mText[mPos]))
      ++mPos;
  }
  // Tokens up to the closing "}" of a group.
  void readTokens(std::vector<std::string_view> &theTokens) {
    for (;;) {
      skipDelimiters();
      if (mPos >= mText.size())
        return;
      if (mText[mPos] == '}') {
        ++mPos;
        return;
      }
      theTokens.push_back(token());
    }
  }
  // One token; a quoted one ends at a double quote followed by a delimiter,
  // a brace or the end, so blanks and braces may stand inside it.
  std::string_view token() {
    if (mQuoted && mText[mPos] == '"') {
      const size_t aBegin = mPos + 1;
      for (size_t i = aBegin; i < mText.size(); ++i) {
        if (mText[i] == '"' && (i + 1 == mText.size() || isDelimiter(mText[i + 1]) || mText[i + 1] == '}' ||
                                mText[i + 1] == '{')) {
          mPos = i + 1;
          return mText.substr(aBegin, i - aBegin);
        }
      }
      mPos = mText.size();
      return mText.substr(aBegin);
    }
    const size_t aBegin = mPos;
    while (mPos < mText.size() && !isDelimiter(mText[mPos]) && mText[mPos] != '}' && mText[mPos] != '{')
      ++mPos;
    if (mPos == aBegin) // a lone "{" inside a group
      ++mPos;
    return mText.substr(aBegin, mPos - aBegin);
  }

  std::string_view mText;
  bool mQuoted;
  size_t mPos = 0;
};

class CTextValueReader {
public:
  explicit CTextValueReader(const CDescriptionSection &theSection) : mSection(theSection) {}

  void read(CDescriptionField &theField, std::string_view theValue) {
    const int32_t aType = theField.getValueType();
    const int32_t aShape = theField.getShape();
    if (aShape == CTLRX_DS_MULTIPLE) {
      readStruct(theField, theValue);
      return;
    }
    if (aShape < CTLRX_DS_SCALAR || aShape > CTLRX_DS_MATRIX) {
      mSection.print(true);
      TLRX_RAISE(CTLRX_ERR_DS_TYPE, theField.getName());
    }
    if (aType != CTLRX_DS_INTEGER && aType != CTLRX_DS_DOUBLE && aType != CTLRX_DS_STRING)
      unusable(theField);
    if (aShape == CTLRX_DS_SCALAR) {
      setCell(theField, 0, 0, scalarToken(theField, theValue));
      return;
    }
    const SBraceValue aValue = braces(theField, theValue);
    if (aShape == CTLRX_DS_VECTOR) {
      if (!aValue.mGroups.empty())
        missing(theField);
      theField.allocate(1, static_cast<int32_t>(aValue.mFlat.size()));
      for (size_t i = 0; i < aValue.mFlat.size(); ++i)
        setCell(theField, 0, static_cast<int32_t>(i), aValue.mFlat[i]);
      return;
    }
    if (aValue.mGroups.empty()) { // one row
      theField.allocate(aValue.mFlat.empty() ? 0 : 1, static_cast<int32_t>(aValue.mFlat.size()));
      for (size_t i = 0; i < aValue.mFlat.size(); ++i)
        setCell(theField, 0, static_cast<int32_t>(i), aValue.mFlat[i]);
      return;
    }
    const size_t aCols = aValue.mGroups.front().size();
    for (const auto &aRow : aValue.mGroups)
      if (aRow.size() != aCols)
        missing(theField);
    theField.allocate(static_cast<int32_t>(aValue.mGroups.size()), static_cast<int32_t>(aCols));
    for (size_t r = 0; r < aValue.mGroups.size(); ++r)
      for (size_t c = 0; c < aCols; ++c)
        setCell(theField, static_cast<int32_t>(r), static_cast<int32_t>(c), aValue.mGroups[r][c]);
  }

private:
  [[noreturn]] void missing(const CDescriptionField &theField) {
    theField.dump();
    TLRX_RAISE(CTLRX_ERR_DS_FIELD_MISSING, theField.getName());
  }
  [[noreturn]] void unusable(const CDescriptionField &theField) {
    theField.dump();
    TLRX_RAISE(CTLRX_ERR_DS_TYPE, theField.getName());
  }

  SBraceValue braces(const CDescriptionField &theField, std::string_view theValue) {
    SBraceValue aValue;
    if (!CBraceParser(theValue, theField.getValueType() == CTLRX_DS_STRING).parse(aValue))
      missing(theField);
    return aValue;
  }

  // The value of a scalar line: a double-quoted text for strings (up to the
  // last double quote) or their first token; a number is the whole rest of
  // the line, so that "30 junk" is refused rather than read as 30.
  std::string_view scalarToken(const CDescriptionField &theField, std::string_view theValue) {
    const size_t aBegin = theValue.find_first_not_of(" \t");
    if (aBegin == std::string_view::npos)
      missing(theField);
    theValue.remove_prefix(aBegin);
    if (theField.getValueType() == CTLRX_DS_STRING && theValue[0] == '"') {
      const size_t aClose = theValue.rfind('"');
      return aClose > 0 ? theValue.substr(1, aClose - 1) : theValue.substr(1);
    }
    if (theField.getValueType() != CTLRX_DS_STRING)
      return theValue;
    return firstToken(theValue, " \t");
  }

  void setCell(CDescriptionField &theField, int32_t theRow, int32_t theCol, std::string_view theToken) {
    mToken.assign(theToken);
    switch (theField.getValueType()) {
    case CTLRX_DS_STRING: theField.setString(theRow, theCol, mToken.c_str()); break;
    default:
      if (!fdfSetNumberFromText(theField, theRow, theCol, mToken.c_str()))
        unusable(theField);
    }
  }

  void readStruct(CDescriptionField &theField, std::string_view theValue) {
    const int32_t aMembers = theField.getMemberCount();
    const CDescriptionField *aFirst = theField.getMember(0);
    if (aFirst == nullptr)
      return;
    for (int32_t m = 0; m < aMembers; ++m) {
      const CDescriptionField *aMember = theField.getMember(m);
      if (aMember == nullptr || aMember->getShape() != aFirst->getShape() ||
          aMember->getValueType() != aFirst->getValueType())
        unusable(theField);
    }
    if (aFirst->getShape() != CTLRX_DS_SCALAR && aFirst->getShape() != CTLRX_DS_VECTOR)
      unusable(theField);
    const SBraceValue aValue = braces(*aFirst, theValue);
    if (aFirst->getShape() == CTLRX_DS_SCALAR) {
      if (!aValue.mGroups.empty() || aValue.mFlat.size() != static_cast<size_t>(aMembers))
        missing(theField);
      for (int32_t m = 0; m < aMembers; ++m)
        setCell(*theField.getMember(m), 0, 0, aValue.mFlat[static_cast<size_t>(m)]);
      return;
    }
    if (!aValue.mFlat.empty())
      missing(theField);
    for (const auto &aElement : aValue.mGroups)
      if (aElement.size() != static_cast<size_t>(aMembers))
        missing(theField);
    theField.setNumberOfElements(static_cast<int32_t>(aValue.mGroups.size()));
    for (size_t i = 0; i < aValue.mGroups.size(); ++i)
      for (int32_t m = 0; m < aMembers; ++m)
        setCell(*theField.getMember(m), 0, static_cast<int32_t>(i), aValue.mGroups[i][static_cast<size_t>(m)]);
  }

  const CDescriptionSection &mSection;
  std::string mToken; // reused for every cell
};

// ------------------------------------------------------------ writing

void appendTextValue(std::string &theOut, const CDescriptionField &theField, int32_t theRow, int32_t theCol) {
  switch (theField.getValueType()) {
  case CTLRX_DS_INTEGER: theOut.append(std::to_string(theField.getInteger(theRow, theCol))); break;
  case CTLRX_DS_DOUBLE: {
    const double aValue = theField.getDouble(theRow, theCol);
    if (std::isnan(aValue)) {
      theOut.append("NaN");
      break;
    }
    // The fewest digits that read back to the same double.
    char aText[64];
    for (int aDigits = 15; aDigits <= 17; ++aDigits) {
      std::snprintf(aText, sizeof aText, "%.*g", aDigits, aValue);
      if (std::strtod(aText, nullptr) == aValue)
        break;
    }
    theOut.append(aText);
    break;
  }
  default:
    theOut.push_back('"');
    if (theField.isSet(theRow, theCol))
      theOut.append(theField.getString(theRow, theCol));
    theOut.push_back('"');
    break;
  }
}

// "{a b c}" of the cells of one row.
void appendRow(std::string &theOut, const CDescriptionField &theField, int32_t theRow) {
  theOut.push_back('{');
  for (int32_t c = 0; c < theField.getColNbr(); ++c) {
    if (c > 0)
      theOut.push_back(' ');
    appendTextValue(theOut, theField, theRow, c);
  }
  theOut.push_back('}');
}

bool isValueType(int32_t theType) {
  return theType == CTLRX_DS_INTEGER || theType == CTLRX_DS_DOUBLE || theType == CTLRX_DS_STRING;
}

bool appendStruct(std::string &theOut, const CDescriptionField &theField) {
  const CDescriptionField *aFirst = theField.getMember(0);
  const int32_t aMembers = theField.getMemberCount();
  if (aFirst == nullptr || (aFirst->getShape() != CTLRX_DS_SCALAR && aFirst->getShape() != CTLRX_DS_VECTOR))
    return false;
  for (int32_t m = 0; m < aMembers; ++m) {
    const CDescriptionField *aMember = theField.getMember(m);
    if (aMember == nullptr || aMember->getShape() != aFirst->getShape() || !isValueType(aMember->getValueType()) ||
        aMember->getColNbr() != aFirst->getColNbr())
      return false;
  }
  theOut.push_back('{');
  if (aFirst->getShape() == CTLRX_DS_SCALAR) {
    for (int32_t m = 0; m < aMembers; ++m) {
      if (m > 0)
        theOut.push_back(' ');
      appendTextValue(theOut, *theField.getMember(m), 0, 0);
    }
  } else {
    for (int32_t i = 0; i < aFirst->getColNbr(); ++i) {
      theOut.append(i > 0 ? " {" : "{");
      for (int32_t m = 0; m < aMembers; ++m) {
        if (m > 0)
          theOut.push_back(' ');
        appendTextValue(theOut, *theField.getMember(m), 0, i);
      }
      theOut.push_back('}');
    }
  }
  theOut.push_back('}');
  return true;
}

bool appendFieldLine(std::string &theOut, const CDescriptionField &theField) {
  const int32_t aShape = theField.getShape();
  if (aShape != CTLRX_DS_MULTIPLE && !isValueType(theField.getValueType()))
    return false;
  std::string aLine = std::string(theField.getName()) + "=";
  switch (aShape) {
  case CTLRX_DS_SCALAR: appendTextValue(aLine, theField, 0, 0); break;
  case CTLRX_DS_VECTOR: appendRow(aLine, theField, 0); break;
  case CTLRX_DS_MATRIX:
    aLine.push_back('{');
    for (int32_t r = 0; r < theField.getRowNbr(); ++r) {
      if (r > 0)
        aLine.push_back(' ');
      appendRow(aLine, theField, r);
    }
    aLine.push_back('}');
    break;
  case CTLRX_DS_MULTIPLE:
    if (!appendStruct(aLine, theField))
      return false;
    break;
  default: return false;
  }
  theOut.append(aLine).push_back('\n');
  return true;
}

// A block runs from its "[name]" line to the next header line.
class CTextSectionBlock : public CSectionBlockFinder {
public:
  explicit CTextSectionBlock(const char *theName) : mName(theName) {}
  bool opensBlock(std::string_view theLine) override {
    const std::string_view aLine = cutLine(theLine);
    return isHeaderLine(aLine) && headerName(aLine) == mName;
  }
  EInside inside(std::string_view theLine) override {
    return isHeaderLine(cutLine(theLine)) ? EInside::endsBefore : EInside::continues;
  }
  bool closedByEndOfFile() const override { return true; }
  bool isInsertionLine(std::string_view) override { return false; }
  bool insertsAtEnd() const override { return true; }

private:
  std::string mName;
};

} // namespace

bool fdfReadTextSection(CDescriptionSection &theSection, const char *theFile) {
  CFilePtr aFile(fdfIsRegularFile(theFile) ? std::fopen(theFile, "rb") : nullptr);
  if (!aFile)
    return false;
  CScratchBuffer aBuffer(CTLRX_TEXT_FORM_MAX_LINE + 3);
  CTextValueReader aReader(theSection);
  const std::string_view aName = theSection.getName();
  bool aInBlock = false, aFound = false;
  std::string aFieldName;
  for (;;) {
    bool aTooLong = false;
    const long aLength = fdfReadRawLine(aFile.get(), aBuffer.data(), aBuffer.capacity(), aTooLong);
    if (aLength < 0)
      break;
    const std::string_view aLine = cutLine(std::string_view(aBuffer.data(), static_cast<size_t>(aLength)));
    if (aTooLong || aLine.size() > CTLRX_TEXT_FORM_MAX_LINE) {
      if (!aInBlock)
        continue; // other sections' lines do not matter here
      fdfTraceMessage("\nline longer than %zu characters in section [%s] of %s\n", CTLRX_TEXT_FORM_MAX_LINE,
                      theSection.getName(), theFile);
      return false;
    }
    if (isHeaderLine(aLine)) {
      if (aInBlock)
        break;
      aInBlock = headerName(aLine) == aName;
      aFound = aFound || aInBlock;
      continue;
    }
    const size_t aEqual = aLine.find('=');
    if (!aInBlock || aEqual == std::string_view::npos)
      continue;
    aFieldName.assign(firstToken(aLine, "\t ="));
    CDescriptionField *aField = theSection.findField(aFieldName.c_str());
    if (aField != nullptr)
      aReader.read(*aField, aLine.substr(aEqual + 1));
  }
  return aFound && !std::ferror(aFile.get());
}

bool fdfWriteTextSection(const CDescriptionSection &theSection, const char *theFile) {
  std::string aBlock = std::string("[") + theSection.getName() + "]\n";
  for (int32_t i = 0; i < theSection.getFieldCount(); ++i) {
    const CDescriptionField *aField = theSection.getField(i);
    if (aField == nullptr || aField->getParentIndex() != -1 || !aField->holdsValue())
      continue;
    if (!appendFieldLine(aBlock, *aField)) {
      fdfTraceMessage("\nfield [%s] of section [%s] has no text form\n", aField->getName(), theSection.getName());
      return false;
    }
  }
  if (!fdfExistDescriptionFile(theFile))
    return fdfReplaceFile(theFile, aBlock);
  CTextSectionBlock aFinder(theSection.getName());
  STLRXSplitFile aSplit;
  if (!fdfSplitFileAroundBlock(theFile, CTLRX_TEXT_FORM_MAX_LINE, aFinder, aSplit))
    return false;
  return fdfReplaceFile(theFile, aSplit.mBefore + aBlock + aSplit.mAfter);
}
