// Description model: fields, sections, descriptions, the scratch-buffer pool
// of the file readers, key files and mandatory-field files.
#include "tlrx_description_section.h"

#include <array>
#include <climits>
#include <cmath>
#include <cstring>
#include <sstream>

#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"

namespace {

constexpr size_t CTLRX_DS_MAX_CELLS = static_cast<size_t>(INT32_MAX);
constexpr const char *CTLRX_KEY_FILE_DELIMS_NAME = "\t =";
constexpr const char *CTLRX_KEY_FILE_DELIMS_TYPE = "\t =(";
constexpr const char *CTLRX_SECTION_HEADER_DELIMS = "\t []";
constexpr const char *CTLRX_MANDATORY_DELIMS = " \r\t\n";

int sDescriptionTraceLevel = 0;

bool isVerbose() { return sDescriptionTraceLevel > 10 && fdfIsTracing(); }

// The fixed size text of a double in the stream's default format.
std::string doubleText(double theValue) {
  std::ostringstream aStream;
  aStream << theValue;
  return aStream.str();
}

// ----------------------------------------------------------- scratch pool

struct SScratchSlot {
  bool mBusy = false;
  size_t mCapacity = 0;
  std::unique_ptr<char[]> mBuffer;
};

std::array<SScratchSlot, CTLRX_DS_POOL_SLOTS> &scratchPool() {
  static std::array<SScratchSlot, CTLRX_DS_POOL_SLOTS> sPool;
  return sPool;
}

// ------------------------------------------------------------- tokenising

// strtok-like walk over one line without modifying it: each call skips
// leading delimiters and returns the next token, with its own delimiters.
class CLineTokens {
public:
  explicit CLineTokens(const std::string &theLine) : mLine(theLine) {}

  bool next(const char *theDelims, std::string &theToken) {
    while (mPos < mLine.size() && std::strchr(theDelims, mLine[mPos]) != nullptr) {
      ++mPos;
    }
    if (mPos >= mLine.size()) {
      return false;
    }
    size_t aEnd = mPos;
    while (aEnd < mLine.size() && std::strchr(theDelims, mLine[aEnd]) == nullptr) {
      ++aEnd;
    }
    theToken = mLine.substr(mPos, aEnd - mPos);
    mPos = aEnd < mLine.size() ? aEnd + 1 : aEnd; // the delimiter is consumed, as strtok does
    return true;
  }

private:
  const std::string &mLine;
  size_t mPos = 0;
};

// Key-file line: cut at the first line feed, carriage return or ";".
std::string cutKeyFileLine(const char *theBuffer) {
  const size_t aLen = std::strcspn(theBuffer, "\n\r;");
  return std::string(theBuffer, aLen);
}

// A section header line has "[" in its first or second character.
bool isSectionHeader(const std::string &theLine) {
  return (!theLine.empty() && theLine[0] == '[') || (theLine.size() > 1 && theLine[1] == '[');
}

std::string sectionHeaderName(const std::string &theLine) {
  CLineTokens aTokens(theLine);
  std::string aName;
  aTokens.next(CTLRX_SECTION_HEADER_DELIMS, aName);
  return aName;
}

// Type code of a key-file declaration: [count][M|V](D|F|I|S).
struct SKeyTypeCode {
  bool mValid = false;
  long mMemberCount = 0;
  int32_t mShape = CTLRX_DS_SCALAR;
  int32_t mValueType = CTLRX_DS_UNRECOGNISED;
};

SKeyTypeCode parseKeyTypeCode(const std::string &theCode) {
  SKeyTypeCode aResult;
  size_t aPos = 0;
  while (aPos < theCode.size() && theCode[aPos] >= '0' && theCode[aPos] <= '9') {
    // Saturate instead of overflowing: any count this large is refused later.
    if (aResult.mMemberCount < CTLRX_DS_MAX_NBR_FIELDS) {
      aResult.mMemberCount = aResult.mMemberCount * 10 + (theCode[aPos] - '0');
    }
    ++aPos;
  }
  if (aPos < theCode.size() && (theCode[aPos] == 'M' || theCode[aPos] == 'V')) {
    aResult.mShape = theCode[aPos] == 'M' ? CTLRX_DS_MATRIX : CTLRX_DS_VECTOR;
    ++aPos;
  }
  if (aPos + 1 != theCode.size()) {
    return aResult; // no value letter, or characters after it
  }
  switch (theCode[aPos]) {
  case 'D':
  case 'F':
    aResult.mValueType = CTLRX_DS_DOUBLE;
    break;
  case 'I':
    aResult.mValueType = CTLRX_DS_INTEGER;
    break;
  case 'S':
    aResult.mValueType = CTLRX_DS_STRING;
    break;
  default:
    return aResult;
  }
  aResult.mValid = true;
  return aResult;
}

using CFileHandle = std::unique_ptr<FILE, int (*)(FILE *)>;

CFileHandle openForReading(const char *thePath) {
  return CFileHandle(fdfIsRegularFile(thePath) ? std::fopen(thePath, "rb") : nullptr, &std::fclose);
}

bool endsWith(const std::string &theText, const char *theSuffix) {
  const size_t aLen = std::strlen(theSuffix);
  return theText.size() >= aLen && theText.compare(theText.size() - aLen, aLen, theSuffix) == 0;
}

std::string settingOrEmpty(const char *theName) {
  std::string aValue;
  if (!fdfGetEnvVar(aValue, theName)) {
    aValue.clear();
  }
  return aValue;
}

} // namespace

#define TLRX_FIELD_RAISE(theCode) raise((theCode), __FILE__, __LINE__)

// ================================================================ helpers

const char *fdfShapeName(int32_t theShape) {
  static const char *const aNames[] = {"SCALAR", "VECTOR", "MARTIX", "MULTIPLE"};
  return theShape >= 0 && theShape <= 3 ? aNames[theShape] : "WRONG";
}

const char *fdfValueTypeName(int32_t theValueType) {
  static const char *const aNames[] = {"Integer", "Double", "String", "Field Of Section pointer"};
  return theValueType >= 0 && theValueType <= 3 ? aNames[theValueType] : "WRONG";
}

int fdfGetDescriptionTraceLevel() { return sDescriptionTraceLevel; }
void fdfSetDescriptionTraceLevel(int theLevel) { sDescriptionTraceLevel = theLevel; }

CScratchBuffer::CScratchBuffer(size_t theMinCapacity) : mSlot(-1) {
  auto &aPool = scratchPool();
  for (int i = 0; i < CTLRX_DS_POOL_SLOTS; ++i) {
    if (!aPool[static_cast<size_t>(i)].mBusy) {
      mSlot = i;
      break;
    }
  }
  if (mSlot < 0) {
    fdfTraceMessage("ECEEDED : %d\n", CTLRX_DS_POOL_SLOTS);
    TLRX_RAISE(CTLRX_ERR_DS_RANGE, "All pools are busy");
  }
  SScratchSlot &aSlot = aPool[static_cast<size_t>(mSlot)];
  const size_t aWanted = theMinCapacity < 2 ? 2 : theMinCapacity;
  if (aSlot.mCapacity < aWanted) {
    aSlot.mBuffer.reset();
    aSlot.mCapacity = 0;
    aSlot.mBuffer.reset(new char[aWanted]);
    aSlot.mCapacity = aWanted;
  }
  aSlot.mBuffer[0] = '\0';
  aSlot.mBusy = true;
}

CScratchBuffer::~CScratchBuffer() { scratchPool()[static_cast<size_t>(mSlot)].mBusy = false; }

char *CScratchBuffer::data() const { return scratchPool()[static_cast<size_t>(mSlot)].mBuffer.get(); }

size_t CScratchBuffer::capacity() const { return scratchPool()[static_cast<size_t>(mSlot)].mCapacity; }

int fdfScratchBuffersInUse() {
  int aCount = 0;
  for (const SScratchSlot &aSlot : scratchPool()) {
    aCount += aSlot.mBusy ? 1 : 0;
  }
  return aCount;
}

long fdfReadTextLine(FILE *theFile, char *theBuffer, size_t theCapacity) {
  if (theFile == nullptr || theBuffer == nullptr || theCapacity < 2) {
    return -1;
  }
  // Byte by byte, so that a NUL inside a line cannot hide where it ends; the
  // tail of an over-long line is consumed and dropped.
  size_t aLen = 0;
  bool aAny = false;
  int aChar = 0;
  while ((aChar = std::getc(theFile)) != EOF) {
    aAny = true;
    if (aLen + 1 < theCapacity) {
      theBuffer[aLen++] = static_cast<char>(aChar);
    }
    if (aChar == '\n') {
      break;
    }
  }
  theBuffer[aLen] = '\0';
  return aAny ? static_cast<long>(aLen) : -1;
}

bool fdfSetNumberFromText(CDescriptionField &theField, int32_t theRow, int32_t theCol, const char *theText) {
  const int32_t aType = theField.getValueType();
  if (aType != CTLRX_DS_INTEGER && aType != CTLRX_DS_DOUBLE)
    return false;
  const char *aText = theText != nullptr ? theText : "";
  int32_t aInteger = 0;
  double aDouble = 0.0;
  if (aType == CTLRX_DS_INTEGER && fdfParseWholeInteger(aText, aInteger)) {
    theField.setInteger(theRow, theCol, aInteger);
    return true;
  }
  // Stored headers hold "-NaN", "nan(0x...)" and the like.
  if (aType == CTLRX_DS_DOUBLE && (std::strstr(aText, "NaN") != nullptr || std::strstr(aText, "nan") != nullptr)) {
    theField.setDouble(theRow, theCol, std::nan(""));
    return true;
  }
  if (aType == CTLRX_DS_DOUBLE && fdfParseWholeDouble(aText, aDouble, false)) {
    theField.setDouble(theRow, theCol, aDouble);
    return true;
  }
  theField.dump();
  TLRX_RAISE_F(CTLRX_ERR_DS_FIELD_MISSING, "%s: not %s: [%.200s]", theField.getName(),
               aType == CTLRX_DS_INTEGER ? "an integer" : "a number", aText);
}

bool fdfExistDescriptionFile(const char *thePath) {
  if (thePath == nullptr || thePath[0] == '\0' || std::strcmp(thePath, "NotOK") == 0) {
    return false;
  }
  return fdfExistFile(thePath);
}

bool fdfExistDescriptionFileOrSml(const char *thePath) {
  if (fdfExistDescriptionFile(thePath)) {
    return true;
  }
  if (thePath == nullptr || !endsWith(thePath, "_hdr")) {
    return false;
  }
  std::string aSml(thePath);
  aSml.replace(aSml.size() - 4, 4, ".sml");
  return fdfExistDescriptionFile(aSml.c_str());
}

// ================================================================= field

CDescriptionField::CDescriptionField(const char *theName, int32_t theShape, int32_t theValueType,
                                     int32_t theParentIndex)
    : mParentIndex(theParentIndex), mName(theName != nullptr ? theName : ""), mShape(theShape),
      mValueType(theValueType) {
  if (mShape == CTLRX_DS_SCALAR) {
    // A scalar owns its single cell for its whole life (flag only for types
    // that hold no values, so every access still fails on the type).
    mRowNbr = 1;
    mColNbr = 1;
    mSetFlags.assign(1, 0);
    if (mValueType == CTLRX_DS_INTEGER) {
      mIntegers.assign(1, 0);
    } else if (mValueType == CTLRX_DS_DOUBLE) {
      mDoubles.assign(1, 0.0);
    } else if (mValueType == CTLRX_DS_STRING) {
      mStrings.assign(1, std::string());
    }
    mHasBlock = true;
  }
}

CDescriptionField::~CDescriptionField() = default;

const char *CDescriptionField::getName() const { return mName.empty() ? CTLRX_DS_NOT_INITIALISED : mName.c_str(); }

void CDescriptionField::raise(int32_t theCode, const char *theFile, int theLine) const {
  dump();
  fdfRaiseError(theCode, getName(), theFile, theLine);
}

void CDescriptionField::freeBlock() {
  mIntegers.clear();
  mIntegers.shrink_to_fit();
  mDoubles.clear();
  mDoubles.shrink_to_fit();
  mStrings.clear();
  mStrings.shrink_to_fit();
  mSetFlags.clear();
  mSetFlags.shrink_to_fit();
  mHasBlock = false;
  mRowNbr = 0;
  mColNbr = 0;
}

void CDescriptionField::allocate(int32_t theRows, int32_t theCols) {
  if (mValueType == CTLRX_DS_FIELD_POINTER || mShape == CTLRX_DS_MULTIPLE ||
      (mValueType != CTLRX_DS_INTEGER && mValueType != CTLRX_DS_DOUBLE && mValueType != CTLRX_DS_STRING)) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_TYPE);
  }
  if (theRows < 0 || theCols < 0 ||
      (theCols > 0 && static_cast<size_t>(theRows) > CTLRX_DS_MAX_CELLS / static_cast<size_t>(theCols))) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_RANGE);
  }
  freeBlock();
  const size_t aCells = static_cast<size_t>(theRows) * static_cast<size_t>(theCols);
  if (mValueType == CTLRX_DS_INTEGER) {
    mIntegers.assign(aCells, 0);
  } else if (mValueType == CTLRX_DS_DOUBLE) {
    mDoubles.assign(aCells, 0.0);
  } else {
    mStrings.assign(aCells, std::string());
  }
  mSetFlags.assign(aCells, 0);
  mRowNbr = theRows;
  mColNbr = theCols;
  mHasBlock = true;
}

void CDescriptionField::setNumberOfElements(int32_t theCount) {
  if (mShape != CTLRX_DS_MULTIPLE) {
    allocate(1, theCount);
    return;
  }
  for (const CDescriptionField *aMember : mMembers) {
    if (aMember == nullptr || aMember->getShape() != CTLRX_DS_VECTOR) {
      TLRX_FIELD_RAISE(CTLRX_ERR_DS_TYPE);
    }
  }
  for (CDescriptionField *aMember : mMembers) {
    aMember->allocate(1, theCount);
  }
}

void CDescriptionField::allocateMembers(int32_t theCount) {
  if (mShape != CTLRX_DS_MULTIPLE) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_TYPE);
  }
  if (theCount < 0 || theCount > CTLRX_DS_MAX_NBR_FIELDS) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_RANGE);
  }
  mMembers.assign(static_cast<size_t>(theCount), nullptr);
  mColNbr = theCount;
  mRowNbr = theCount > 0 ? 1 : 0;
}

void CDescriptionField::setMember(int32_t theIndex, CDescriptionField *theMember) {
  if (theIndex < 0 || static_cast<size_t>(theIndex) >= mMembers.size()) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_RANGE);
  }
  mMembers[static_cast<size_t>(theIndex)] = theMember;
}

CDescriptionField *CDescriptionField::getMember(int32_t theIndex) const {
  if (theIndex < 0 || static_cast<size_t>(theIndex) >= mMembers.size()) {
    return nullptr;
  }
  return mMembers[static_cast<size_t>(theIndex)];
}

int32_t CDescriptionField::getMemberCount() const {
  return mShape == CTLRX_DS_MULTIPLE ? static_cast<int32_t>(mMembers.size()) : 0;
}

int32_t CDescriptionField::getNumberOfElements() const {
  if (mShape == CTLRX_DS_MULTIPLE) {
    return mMembers.empty() || mMembers[0] == nullptr ? 0 : mMembers[0]->getColNbr();
  }
  return mRowNbr * mColNbr;
}

// ------------------------------------------------------------------ checks

size_t CDescriptionField::cellIndex(int32_t theRow, int32_t theCol) const {
  return static_cast<size_t>(theRow) * static_cast<size_t>(mColNbr) + static_cast<size_t>(theCol);
}

bool CDescriptionField::checkRowCol(int32_t theRow, int32_t theCol) const {
  if (mHasBlock && theRow >= 0 && theCol >= 0 && theRow < mRowNbr && theCol < mColNbr &&
      cellIndex(theRow, theCol) < mSetFlags.size()) {
    return true;
  }
  if (isVerbose()) {
    fdfTraceMessage("mRowNbr = %d\ntheRow = %d\nmColNbr = %d\ntheCol = %d\n", mRowNbr, theRow, mColNbr, theCol);
  }
  return false;
}

bool CDescriptionField::checkVectorIndex(int32_t theIndex) const {
  if (mShape == CTLRX_DS_VECTOR || mShape == CTLRX_DS_MULTIPLE) {
    if (theIndex >= 0 && theIndex < mColNbr) {
      return true;
    }
    if (isVerbose()) {
      fdfTraceMessage(" Warning index : %d ; numer of elements : %d\n", theIndex, mColNbr);
    }
    return false;
  }
  if (theIndex > 0) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_TYPE);
  }
  // Index 0 of a scalar or matrix is its first cell, when there is one.
  return theIndex == 0 && !mSetFlags.empty();
}

// ----------------------------------------------------------------- getters

int32_t CDescriptionField::getInteger() const {
  if (mValueType != CTLRX_DS_INTEGER) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_TYPE);
  }
  if (mSetFlags.empty() || mSetFlags[0] == 0) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_NOT_SET);
  }
  return mIntegers[0];
}

int32_t CDescriptionField::getInteger(int32_t theIndex) const {
  if (mValueType != CTLRX_DS_INTEGER) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_TYPE);
  }
  if (!checkVectorIndex(theIndex) || static_cast<size_t>(theIndex) >= mIntegers.size()) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_RANGE);
  }
  return mIntegers[static_cast<size_t>(theIndex)];
}

int32_t CDescriptionField::getInteger(int32_t theRow, int32_t theCol) const {
  if (!checkRowCol(theRow, theCol)) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_RANGE);
  }
  if (mValueType != CTLRX_DS_INTEGER) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_TYPE);
  }
  return mIntegers[cellIndex(theRow, theCol)];
}

double CDescriptionField::getDouble() const {
  if (mValueType != CTLRX_DS_DOUBLE) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_TYPE);
  }
  if (mSetFlags.empty() || mSetFlags[0] == 0) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_NOT_SET);
  }
  return mDoubles[0];
}

double CDescriptionField::getDouble(int32_t theIndex) const {
  if (mValueType != CTLRX_DS_DOUBLE) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_TYPE);
  }
  if (checkVectorIndex(theIndex) && static_cast<size_t>(theIndex) < mDoubles.size()) {
    return mDoubles[static_cast<size_t>(theIndex)];
  }
  fdfTraceMessage("%d READ error %d\n", theIndex, theIndex);
  // Pulse durations feed the range compression: a substitute would be wrong.
  if (mName.find("PulseDuration") != std::string::npos) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_RANGE);
  }
  return CTLRX_DS_MISSING_DOUBLE;
}

double CDescriptionField::getDouble(int32_t theRow, int32_t theCol) const {
  if (mValueType != CTLRX_DS_DOUBLE) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_TYPE);
  }
  if (!checkRowCol(theRow, theCol)) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_RANGE);
  }
  return mDoubles[cellIndex(theRow, theCol)];
}

const char *CDescriptionField::getString() const {
  if (mValueType != CTLRX_DS_STRING) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_TYPE);
  }
  if (mSetFlags.empty() || mSetFlags[0] == 0) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_NOT_SET);
  }
  return mStrings[0].c_str();
}

const char *CDescriptionField::getString(int32_t theIndex) const {
  if (mValueType != CTLRX_DS_STRING) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_TYPE);
  }
  if (!isSet(theIndex) || static_cast<size_t>(theIndex) >= mStrings.size()) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_NOT_SET);
  }
  return mStrings[static_cast<size_t>(theIndex)].c_str();
}

const char *CDescriptionField::getString(int32_t theRow, int32_t theCol) const {
  if (!isSet(theRow, theCol)) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_NOT_SET);
  }
  if (mValueType != CTLRX_DS_STRING) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_TYPE);
  }
  const size_t aCell = cellIndex(theRow, theCol);
  if (aCell >= mStrings.size()) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_NOT_SET);
  }
  return mStrings[aCell].c_str();
}

// ----------------------------------------------------------------- setters

void CDescriptionField::prepareSet(int32_t theRow, int32_t theCol, int32_t theValueType) const {
  if (!mHasBlock) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_RANGE);
  }
  if (!checkRowCol(theRow, theCol)) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_RANGE);
  }
  if (mValueType != theValueType) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_TYPE);
  }
}

void CDescriptionField::setInteger(int32_t theValue) { setInteger(0, 0, theValue); }
void CDescriptionField::setInteger(int32_t theIndex, int32_t theValue) { setInteger(0, theIndex, theValue); }
void CDescriptionField::setInteger(int32_t theRow, int32_t theCol, int32_t theValue) {
  prepareSet(theRow, theCol, CTLRX_DS_INTEGER);
  const size_t aCell = cellIndex(theRow, theCol);
  mIntegers[aCell] = theValue;
  mSetFlags[aCell] = 1;
}

void CDescriptionField::setDouble(double theValue) { setDouble(0, 0, theValue); }
void CDescriptionField::setDouble(int32_t theIndex, double theValue) { setDouble(0, theIndex, theValue); }
void CDescriptionField::setDouble(int32_t theRow, int32_t theCol, double theValue) {
  prepareSet(theRow, theCol, CTLRX_DS_DOUBLE);
  const size_t aCell = cellIndex(theRow, theCol);
  mDoubles[aCell] = theValue;
  mSetFlags[aCell] = 1;
}

void CDescriptionField::setString(const char *theValue) { setString(0, 0, theValue); }
void CDescriptionField::setString(int32_t theIndex, const char *theValue) { setString(0, theIndex, theValue); }
void CDescriptionField::setString(int32_t theRow, int32_t theCol, const char *theValue) {
  prepareSet(theRow, theCol, CTLRX_DS_STRING);
  const size_t aCell = cellIndex(theRow, theCol);
  mStrings[aCell] = theValue != nullptr ? theValue : "";
  mSetFlags[aCell] = 1;
}

void CDescriptionField::unset() { unset(0, 0); }
void CDescriptionField::unset(int32_t theIndex) { unset(0, theIndex); }
void CDescriptionField::unset(int32_t theRow, int32_t theCol) {
  if (!checkRowCol(theRow, theCol)) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_RANGE);
  }
  const size_t aCell = cellIndex(theRow, theCol);
  if (aCell < mStrings.size()) {
    std::string().swap(mStrings[aCell]);
  }
  mSetFlags[aCell] = 0;
}

// ------------------------------------------------------------------- tests

bool CDescriptionField::isSet() const {
  if (mShape != CTLRX_DS_SCALAR) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_TYPE);
  }
  if (!mHasBlock || mSetFlags.empty()) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_CHECK);
  }
  return mSetFlags[0] != 0;
}

bool CDescriptionField::isSet(int32_t theIndex) const {
  if (mShape == CTLRX_DS_MULTIPLE) {
    // An element of a struct is set when it is set in every member.
    if (mMembers.empty() || theIndex < 0) {
      return false;
    }
    for (const CDescriptionField *aMember : mMembers) {
      if (aMember == nullptr || !aMember->isSet(0, theIndex)) {
        return false;
      }
    }
    return true;
  }
  if (mShape != CTLRX_DS_VECTOR && theIndex > 0) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_TYPE);
  }
  return isSet(0, theIndex);
}

bool CDescriptionField::isSet(int32_t theRow, int32_t theCol) const {
  if (!mHasBlock || theRow < 0 || theCol < 0 || theRow >= mRowNbr || theCol >= mColNbr) {
    return false;
  }
  const size_t aCell = cellIndex(theRow, theCol);
  return aCell < mSetFlags.size() && mSetFlags[aCell] != 0;
}

bool CDescriptionField::holdsValue() const {
  switch (mShape) {
  case CTLRX_DS_SCALAR:
  case CTLRX_DS_VECTOR:
  case CTLRX_DS_MATRIX:
    if (mRowNbr < 1 || mColNbr < 1 || mSetFlags.empty()) {
      return false;
    }
    return mShape != CTLRX_DS_SCALAR || mSetFlags[0] != 0;
  case CTLRX_DS_MULTIPLE: {
    if (mMembers.empty() || mMembers[0] == nullptr) {
      return false;
    }
    const int32_t aMemberShape = mMembers[0]->getShape();
    if (aMemberShape != CTLRX_DS_SCALAR && aMemberShape != CTLRX_DS_VECTOR) {
      return true;
    }
    for (const CDescriptionField *aMember : mMembers) {
      if (aMember == nullptr || !aMember->holdsValue()) {
        return false;
      }
    }
    return true;
  }
  default:
    return false;
  }
}

// --------------------------------------------------- assignment and dumping

bool CDescriptionField::assignFrom(const CDescriptionField &theSource) {
  if (&theSource == this || !theSource.holdsValue()) {
    return true;
  }
  if (theSource.mValueType != mValueType) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_TYPE);
  }
  if (theSource.mShape == CTLRX_DS_MULTIPLE) {
    // Members are copied as the ordinary fields they also are.
    if (mShape != CTLRX_DS_MULTIPLE || theSource.getMemberCount() != getMemberCount()) {
      TLRX_FIELD_RAISE(CTLRX_ERR_DS_TYPE);
    }
    return true;
  }
  if (theSource.mShape < CTLRX_DS_SCALAR || theSource.mShape > CTLRX_DS_MATRIX || mShape < CTLRX_DS_SCALAR ||
      mShape > CTLRX_DS_MATRIX) {
    TLRX_FIELD_RAISE(CTLRX_ERR_DS_TYPE);
  }
  allocate(theSource.mRowNbr, theSource.mColNbr);
  for (int32_t aRow = 0; aRow < mRowNbr; ++aRow) {
    for (int32_t aCol = 0; aCol < mColNbr; ++aCol) {
      if (!theSource.isSet(aRow, aCol)) {
        continue;
      }
      const size_t aCell = cellIndex(aRow, aCol);
      if (mValueType == CTLRX_DS_INTEGER) {
        setInteger(aRow, aCol, theSource.mIntegers[aCell]);
      } else if (mValueType == CTLRX_DS_DOUBLE) {
        setDouble(aRow, aCol, theSource.mDoubles[aCell]);
      } else {
        setString(aRow, aCol, theSource.mStrings[aCell].c_str());
      }
    }
  }
  return true;
}

void CDescriptionField::clear() {
  if (mShape == CTLRX_DS_VECTOR || mShape == CTLRX_DS_MATRIX) {
    freeBlock();
  } else if (mShape == CTLRX_DS_SCALAR && !mSetFlags.empty()) {
    if (!mStrings.empty()) {
      std::string().swap(mStrings[0]);
    }
    mSetFlags[0] = 0;
  }
}

void CDescriptionField::release() {
  if (mShape == CTLRX_DS_MULTIPLE) {
    mMembers.clear();
    mMembers.shrink_to_fit();
    mColNbr = 0;
    mRowNbr = 0;
    return;
  }
  freeBlock();
}

std::string CDescriptionField::dumpText() const {
  if (mName.empty()) {
    return std::string();
  }
  char aBuffer[256];
  std::string aText = "[" + mName + "]  [" + fdfShapeName(mShape) + "]  [" + fdfValueTypeName(mValueType) + "]";
  if (!holdsValue()) {
    return aText + " : EMPTY\n";
  }
  if (mShape == CTLRX_DS_VECTOR) {
    std::snprintf(aBuffer, sizeof(aBuffer), "  [Number of elements : %d]", mColNbr);
    aText += aBuffer;
  } else if (mShape == CTLRX_DS_MATRIX) {
    std::snprintf(aBuffer, sizeof(aBuffer), "  [Row Nbr : %d]  [Col Nbr : %d]", mRowNbr, mColNbr);
    aText += aBuffer;
  } else if (mShape == CTLRX_DS_MULTIPLE) {
    std::snprintf(aBuffer, sizeof(aBuffer), "  [Number of sub fiels : %d]", getMemberCount());
    aText += aBuffer;
  }
  switch (mValueType) {
  case CTLRX_DS_INTEGER:
    std::snprintf(aBuffer, sizeof(aBuffer), "  =  %ld", static_cast<long>(mIntegers.empty() ? 0 : mIntegers[0]));
    aText += aBuffer;
    break;
  case CTLRX_DS_DOUBLE:
    aText += "  =  " + doubleText(mDoubles.empty() ? 0.0 : mDoubles[0]);
    break;
  case CTLRX_DS_STRING:
    aText += "  =  [" + (mStrings.empty() ? std::string() : mStrings[0]) + "]";
    break;
  case CTLRX_DS_FIELD_POINTER:
    break;
  default:
    aText += " : ERROR";
    break;
  }
  return aText + "\n";
}

void CDescriptionField::dump() const {
  if (fdfIsTracing() && !mName.empty()) {
    fdfTraceMessage("%s", dumpText().c_str());
  }
}

CDescriptionField &CDescriptionField::operator=(int32_t theValue) {
  setInteger(theValue);
  return *this;
}

CDescriptionField &CDescriptionField::operator=(double theValue) {
  setDouble(theValue);
  return *this;
}

CDescriptionField &CDescriptionField::operator=(const char *theValue) {
  setString(theValue);
  return *this;
}

CDescriptionField &CDescriptionField::operator=(const std::string &theValue) {
  setString(theValue.c_str());
  return *this;
}

// =============================================================== section

CDescriptionSection::CDescriptionSection() : mRootTag(CTLRX_DS_DEFAULT_ROOT_TAG) {}

CDescriptionSection::CDescriptionSection(const char *theName, const char *theRootTag)
    : mName(theName != nullptr ? theName : ""),
      mRootTag(theRootTag != nullptr ? theRootTag : CTLRX_DS_DEFAULT_ROOT_TAG) {
  declareFromKeyFile(nullptr, theName);
}

CDescriptionSection::~CDescriptionSection() = default;

const char *CDescriptionSection::getName() const { return mName.empty() ? CTLRX_DS_NOT_INITIALISED : mName.c_str(); }

void CDescriptionSection::setName(const char *theName) { mName = theName != nullptr ? theName : ""; }

void CDescriptionSection::setRootTag(const char *theRootTag) {
  mRootTag = theRootTag != nullptr ? theRootTag : CTLRX_DS_DEFAULT_ROOT_TAG;
}

void CDescriptionSection::releaseFields() {
  for (auto &aField : mFields) {
    aField->release();
  }
  mFields.clear();
}

int32_t CDescriptionSection::appendField(std::unique_ptr<CDescriptionField> theField) {
  mFields.push_back(std::move(theField));
  return static_cast<int32_t>(mFields.size()) - 1;
}

CDescriptionField *CDescriptionSection::findField(const char *theName) const {
  if (theName == nullptr) {
    return nullptr;
  }
  for (const auto &aField : mFields) {
    if (aField->hasName() && std::strcmp(aField->getName(), theName) == 0) {
      return aField.get();
    }
  }
  return nullptr;
}

CDescriptionField *CDescriptionSection::getField(int32_t theIndex) const {
  if (theIndex < 0 || theIndex >= getFieldCount()) {
    return nullptr;
  }
  return mFields[static_cast<size_t>(theIndex)].get();
}

bool CDescriptionSection::holdsValue() const {
  for (const auto &aField : mFields) {
    if (aField->holdsValue()) {
      return true;
    }
  }
  return false;
}

void CDescriptionSection::clearValues() {
  for (auto &aField : mFields) {
    aField->clear();
  }
}

bool CDescriptionSection::copyValuesFrom(const CDescriptionSection &theSource) {
  if (&theSource == this) {
    return true;
  }
  // Positional copy: a source of another layout would be read past its end.
  if (mName != theSource.mName || getFieldCount() != theSource.getFieldCount()) {
    return false;
  }
  for (int32_t i = 0; i < getFieldCount(); ++i) {
    CDescriptionField &aTarget = *mFields[static_cast<size_t>(i)];
    // Scale factors describe this raster's own storage, not the source's.
    if (std::strcmp(aTarget.getName(), "RealScaleFactor") == 0 ||
        std::strcmp(aTarget.getName(), "ImaginaryScaleFactor") == 0) {
      continue;
    }
    if (!aTarget.assignFrom(*theSource.mFields[static_cast<size_t>(i)])) {
      return false;
    }
  }
  return true;
}

std::string CDescriptionSection::printText(bool theAll) const {
  char aBuffer[512];
  std::snprintf(aBuffer, sizeof(aBuffer), "\n\n << [%s]  -  Total number of Fields : %d >>\n\n", getName(),
                getFieldCount());
  std::string aText = aBuffer;
  for (const auto &aField : mFields) {
    if (theAll || aField->holdsValue()) {
      aText += aField->dumpText();
    }
  }
  return aText;
}

void CDescriptionSection::print(bool theAll) const {
  if (!fdfIsTracing()) {
    return;
  }
  // Field by field: the trace formats into a bounded buffer.
  fdfTraceMessage("\n\n << [%s]  -  Total number of Fields : %d >>\n\n", getName(), getFieldCount());
  for (const auto &aField : mFields) {
    if (theAll || aField->holdsValue()) {
      aField->dump();
    }
  }
}

bool CDescriptionSection::declareFromKeyFile(const char *theFile, const char *theSectionName) {
  CScratchBuffer aBuffer;
  releaseFields();
  if (theFile == nullptr && theSectionName == nullptr) {
    print(true);
    TLRX_RAISE(CTLRX_ERR_DS_DECLARATION, getName());
  }
  std::string aPath = theFile != nullptr ? std::string(theFile)
                                         : fdfGetRequiredEnvVar("TELLURIX_KEY_FILES_DIR") + theSectionName + ".key";
  if (!fdfExistDescriptionFile(aPath.c_str())) {
    if (!fdfExistDescriptionFileOrSml(aPath.c_str())) {
      fdfTraceMessage("Error: missing key file %s\n", aPath.c_str());
      TLRX_RAISE(CTLRX_ERR_FILE_OPEN, aPath.c_str());
    }
    aPath.replace(aPath.size() - 4, 4, ".sml");
  }
  CFileHandle aFile = openForReading(aPath.c_str());
  if (!aFile) {
    fdfTraceMessage("Error: missing key file %s\n", aPath.c_str());
    TLRX_RAISE(CTLRX_ERR_FILE_OPEN, aPath.c_str());
  }

  // Find the block of the section.
  bool aFound = false;
  while (!aFound && fdfReadTextLine(aFile.get(), aBuffer.data(), aBuffer.capacity()) >= 0) {
    const std::string aLine = cutKeyFileLine(aBuffer.data());
    if (aLine.empty() || !isSectionHeader(aLine)) {
      continue;
    }
    const std::string aName = sectionHeaderName(aLine);
    if (theSectionName == nullptr || aName == theSectionName) {
      mName = aName;
      aFound = true;
    }
  }
  if (!aFound) {
    return false;
  }

  // Declarations up to the end of the file.
  std::vector<std::unique_ptr<CDescriptionField>> aFields;
  auto aAppend = [&](std::unique_ptr<CDescriptionField> theField) {
    aFields.push_back(std::move(theField));
    if (static_cast<int32_t>(aFields.size()) >= CTLRX_DS_MAX_NBR_FIELDS) {
      fdfTraceMessage("CTLRX_DS_MAX_NBR_FIELDS = %d\naFieldsNbr = %d\n", CTLRX_DS_MAX_NBR_FIELDS,
                      static_cast<int>(aFields.size()));
      mFields = std::move(aFields);
      print(true);
      TLRX_RAISE(CTLRX_ERR_DS_DECLARATION, getName());
    }
    return aFields.back().get();
  };
  while (fdfReadTextLine(aFile.get(), aBuffer.data(), aBuffer.capacity()) >= 0) {
    const std::string aLine = cutKeyFileLine(aBuffer.data());
    if (aLine.find('=') == std::string::npos) {
      continue;
    }
    CLineTokens aTokens(aLine);
    std::string aFieldName;
    std::string aTypeCode;
    aTokens.next(CTLRX_KEY_FILE_DELIMS_NAME, aFieldName);
    aTokens.next(CTLRX_KEY_FILE_DELIMS_TYPE, aTypeCode);
    const SKeyTypeCode aType = parseKeyTypeCode(aTypeCode);
    if (!aType.mValid) {
      fdfTraceMessage("Unrecognised type code [%s] of field [%s]\n", aTypeCode.c_str(), aFieldName.c_str());
      mFields = std::move(aFields);
      print(true);
      TLRX_RAISE(CTLRX_ERR_DS_TYPE, getName());
    }
    if (aType.mMemberCount == 0) {
      aAppend(std::make_unique<CDescriptionField>(aFieldName.c_str(), aType.mShape, aType.mValueType, -1));
      continue;
    }
    // A struct and its members must fit in the section before anything is
    // sized by the declared count.
    if (aType.mMemberCount >= CTLRX_DS_MAX_NBR_FIELDS - static_cast<long>(aFields.size()) - 1) {
      fdfTraceMessage("CTLRX_DS_MAX_NBR_FIELDS = %d\naFieldsNbr = %ld\n", CTLRX_DS_MAX_NBR_FIELDS,
                      static_cast<long>(aFields.size()) + 1 + aType.mMemberCount);
      mFields = std::move(aFields);
      print(true);
      TLRX_RAISE(CTLRX_ERR_DS_DECLARATION, getName());
    }
    const int32_t aStructIndex = static_cast<int32_t>(aFields.size());
    CDescriptionField *aStruct =
        aAppend(std::make_unique<CDescriptionField>(aFieldName.c_str(), CTLRX_DS_MULTIPLE, CTLRX_DS_FIELD_POINTER, -1));
    aStruct->allocateMembers(static_cast<int32_t>(aType.mMemberCount));
    for (int32_t i = 0; i < static_cast<int32_t>(aType.mMemberCount); ++i) {
      std::string aMemberName;
      if (!aTokens.next(CTLRX_KEY_FILE_DELIMS_NAME, aMemberName)) {
        fdfTraceMessage("Struct [%s] declares %ld members and names %d\n", aFieldName.c_str(), aType.mMemberCount,
                        static_cast<int>(i));
        mFields = std::move(aFields);
        print(true);
        TLRX_RAISE(CTLRX_ERR_DS_DECLARATION, getName());
      }
      aStruct->setMember(i, aAppend(std::make_unique<CDescriptionField>(aMemberName.c_str(), aType.mShape,
                                                                        aType.mValueType, aStructIndex)));
    }
  }
  mFields = std::move(aFields);
  return true;
}

bool CDescriptionSection::checkMandatory(const char *theMandatoryFile, const char *theSectionName) const {
  CScratchBuffer aBuffer;
  CFileHandle aFile = openForReading(theMandatoryFile != nullptr ? theMandatoryFile : "");
  if (!aFile) {
    // Nothing can be verified without the list: report it as a failure.
    fdfLogMessage("Mandatory file [%s] not found\n", theMandatoryFile != nullptr ? theMandatoryFile : "");
    return false;
  }
  const std::string aWanted = theSectionName != nullptr ? theSectionName : "";
  bool aInBlock = false;
  bool aResult = true;
  while (fdfReadTextLine(aFile.get(), aBuffer.data(), aBuffer.capacity()) >= 0) {
    const std::string aLine(aBuffer.data());
    if (isSectionHeader(aLine)) {
      if (aInBlock) {
        break;
      }
      aInBlock = sectionHeaderName(aLine) == aWanted;
      continue;
    }
    if (!aInBlock) {
      continue;
    }
    CLineTokens aTokens(aLine);
    std::string aName;
    if (!aTokens.next(CTLRX_MANDATORY_DELIMS, aName)) {
      continue;
    }
    if (aName.size() >= 2 && aName.front() == '"' && aName.back() == '"') {
      aName = aName.substr(1, aName.size() - 2);
    }
    const CDescriptionField *aField = findField(aName.c_str());
    if (aField != nullptr && !aField->holdsValue()) {
      fdfLogMessage("Mandatory Field [%s] is not found in [%s] section\n", aName.c_str(), aWanted.c_str());
      aResult = false;
    }
  }
  return aResult;
}

// =========================================================== description

CDescription::CDescription() : mRootTag(CTLRX_DS_DEFAULT_ROOT_TAG) {}

CDescription::CDescription(const std::vector<std::string> &theSectionNames) : mRootTag(CTLRX_DS_DEFAULT_ROOT_TAG) {
  initialise(theSectionNames);
}

CDescription::~CDescription() = default;

CDescription &CDescription::operator=(const CDescription &theOther) {
  if (&theOther != this && !copyFrom(theOther, true)) {
    print(true);
    TLRX_RAISE(CTLRX_ERR_DS_DECLARATION, getRootTag());
  }
  return *this;
}

void CDescription::initialise(const std::vector<std::string> &theSectionNames) {
  clear();
  for (const std::string &aName : theSectionNames) {
    addSection(std::make_unique<CDescriptionSection>(aName.c_str()));
  }
}

void CDescription::clear() { mSections.clear(); }

void CDescription::setRootTag(const char *theRootTag) {
  mRootTag = theRootTag != nullptr ? theRootTag : CTLRX_DS_DEFAULT_ROOT_TAG;
}

CDescriptionSection *CDescription::addSection(std::unique_ptr<CDescriptionSection> theSection) {
  mSections.push_back(std::move(theSection));
  return mSections.back().get();
}

CDescriptionSection *CDescription::findSection(const char *theName) const {
  if (theName == nullptr) {
    return nullptr;
  }
  for (const auto &aSection : mSections) {
    if (std::strcmp(aSection->getName(), theName) == 0) {
      return aSection.get();
    }
  }
  return nullptr;
}

CDescriptionSection *CDescription::getSection(int32_t theIndex) const {
  if (theIndex < 0 || theIndex >= getSectionCount()) {
    return nullptr;
  }
  return mSections[static_cast<size_t>(theIndex)].get();
}

CDescriptionField *CDescription::findField(const char *theKey) const {
  if (theKey == nullptr) {
    return nullptr;
  }
  const char *aDot = std::strchr(theKey, '.');
  if (aDot != nullptr) {
    const std::string aSectionName(theKey, static_cast<size_t>(aDot - theKey));
    const CDescriptionSection *aSection = findSection(aSectionName.c_str());
    return aSection != nullptr ? aSection->findField(aDot + 1) : nullptr;
  }
  for (const auto &aSection : mSections) {
    if (CDescriptionField *aField = aSection->findField(theKey)) {
      return aField;
    }
  }
  return nullptr;
}

CDescriptionField &CDescription::getField(const char *theKey) const {
  CDescriptionField *aField = findField(theKey);
  if (aField == nullptr) {
    print(true);
    print(false);
    TLRX_RAISE(CTLRX_ERR_DS_FIELD_MISSING, theKey != nullptr ? theKey : "");
  }
  return *aField;
}

CDescriptionField &CDescription::getFieldWithValue(const char *theKey) const {
  CDescriptionField &aField = getField(theKey);
  if (!aField.holdsValue()) {
    aField.dump();
    TLRX_RAISE(CTLRX_ERR_DS_FIELD_MISSING, theKey);
  }
  return aField;
}

bool CDescription::copyFrom(const CDescription &theOther, bool theClearFirst) {
  if (&theOther == this) {
    return true;
  }
  for (const auto &aSource : theOther.mSections) {
    CDescriptionSection *aTarget = findSection(aSource->getName());
    if (aTarget == nullptr) {
      continue;
    }
    if (theClearFirst) {
      aTarget->clearValues();
    }
    if (!aTarget->copyValuesFrom(*aSource)) {
      return false;
    }
  }
  return true;
}

void CDescription::clearValues() {
  for (auto &aSection : mSections) {
    aSection->clearValues();
  }
}

bool CDescription::holdsValue() const {
  for (const auto &aSection : mSections) {
    if (aSection->holdsValue()) {
      return true;
    }
  }
  return false;
}

std::string CDescription::printText(bool theAll) const {
  char aBuffer[128];
  std::snprintf(aBuffer, sizeof(aBuffer), "\n\n << Total number of Sections : %d >>", getSectionCount());
  std::string aText = aBuffer;
  for (const auto &aSection : mSections) {
    aText += aSection->printText(theAll);
  }
  return aText + "\n\n";
}

void CDescription::print(bool theAll) const {
  if (!fdfIsTracing()) {
    return;
  }
  fdfTraceMessage("\n\n << Total number of Sections : %d >>", getSectionCount());
  for (const auto &aSection : mSections) {
    aSection->print(theAll);
  }
  fdfTraceMessage("\n\n");
}

bool CDescription::checkMandatory(const char *theName, bool theRaise) const {
  const std::string aName = theName != nullptr ? theName : "";
  const std::string aPath =
      fdfExistDescriptionFile(aName.c_str()) ? aName : settingOrEmpty("TELLURIX_MANDATORY_DIR") + aName + ".mandatory";
  fdfLogMessage("\n");
  for (const auto &aSection : mSections) {
    if (!aSection->checkMandatory(aPath.c_str(), aSection->getName())) {
      if (theRaise) {
        print(false);
        TLRX_RAISE(CTLRX_ERR_DS_CHECK, aName.c_str());
      }
      return false;
    }
  }
  return true;
}
