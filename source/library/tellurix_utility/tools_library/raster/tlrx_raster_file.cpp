// Raster file: opening, positioning, record transfer, line cache, closing.
#include "tlrx_raster_file.h"

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cmath>
#include <cstdlib>
#include <cstring>
#include <sys/stat.h>
#include <sys/types.h>
#include <unistd.h>

#include "tlrx_description_section.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"
#include "tlrx_header_numbers.h"
#include "tlrx_platform.h"
#include "tlrx_standard_header.h"

static_assert(sizeof(off_t) >= 8, "raster files need 64-bit offsets");

namespace {

// Offsets below it are reported in the short positioning trace; it also gives
// mMaxLineSeek, the last line reachable below it.
constexpr int64_t CTLRX_RF_SHORT_SEEK_LIMIT = 2000000000;
constexpr size_t CTLRX_RF_PADDING_CHUNK = 1 << 20;        // bytes of zeros written per call when padding
// Stream buffer: line-sized transfers then cost one system call per many
// lines; transfers of a whole buffer or more bypass it.
constexpr size_t CTLRX_RF_STREAM_BUFFER = 1 << 18;

bool machineIsMSBF() {
  const uint16_t aProbe = 1;
  uint8_t aFirst;
  std::memcpy(&aFirst, &aProbe, 1);
  return aFirst == 0;
}

// ------------------------------------------------ header fields of RasterInfo

int32_t saturateToInt32(double theValue) {
  if (std::isnan(theValue))
    return INT32_MIN;
  if (theValue >= static_cast<double>(INT32_MAX))
    return INT32_MAX;
  if (theValue <= static_cast<double>(INT32_MIN))
    return INT32_MIN;
  return static_cast<int32_t>(theValue);
}

// A scalar field of "RasterInfo" that holds a value, or nullptr.
const CDescriptionField *presentField(const CDescription &theHeader, const char *theName) {
  char aKey[128];
  std::snprintf(aKey, sizeof(aKey), "RasterInfo.%s", theName);
  const CDescriptionField *aField = theHeader.findField(aKey);
  if (aField == nullptr || aField->getShape() != CTLRX_DS_SCALAR || !aField->holdsValue())
    return nullptr;
  return aField;
}

// "RasterInfo." + theName, read whole by the header accessors: a text that is
// not a number, or a number a count cannot hold, raises 848642 naming it.
std::string rasterInfoKey(const char *theName) { return std::string("RasterInfo.") + theName; }

int32_t integerField(const CDescription &theHeader, const char *theName, int32_t theDefault) {
  return fdfHeaderIntegerOr(theHeader, rasterInfoKey(theName).c_str(), theDefault);
}

double doubleField(const CDescription &theHeader, const char *theName, double theDefault) {
  return fdfHeaderRealOr(theHeader, rasterInfoKey(theName).c_str(), theDefault);
}

const char *stringField(const CDescription &theHeader, const char *theName) {
  const CDescriptionField *aField = presentField(theHeader, theName);
  return aField != nullptr && aField->getValueType() == CTLRX_DS_STRING ? aField->getString() : nullptr;
}

// Stores a number into a declared scalar field of "RasterInfo" in its own type.
void storeNumber(CDescription &theHeader, const char *theName, double theValue) {
  char aKey[128];
  std::snprintf(aKey, sizeof(aKey), "RasterInfo.%s", theName);
  CDescriptionField *aField = theHeader.findField(aKey);
  if (aField == nullptr || aField->getShape() != CTLRX_DS_SCALAR)
    return;
  char aText[64];
  switch (aField->getValueType()) {
  case CTLRX_DS_INTEGER: aField->setInteger(saturateToInt32(theValue)); break;
  case CTLRX_DS_DOUBLE: aField->setDouble(theValue); break;
  case CTLRX_DS_STRING:
    std::snprintf(aText, sizeof(aText), "%.17g", theValue);
    aField->setString(aText);
    break;
  default: break;
  }
}

void storeText(CDescription &theHeader, const char *theName, const char *theText) {
  char aKey[128];
  std::snprintf(aKey, sizeof(aKey), "RasterInfo.%s", theName);
  CDescriptionField *aField = theHeader.findField(aKey);
  if (aField != nullptr && aField->getShape() == CTLRX_DS_SCALAR && aField->getValueType() == CTLRX_DS_STRING)
    aField->setString(theText);
}

uint16_t byteSwap(uint16_t theValue) { return __builtin_bswap16(theValue); }
uint32_t byteSwap(uint32_t theValue) { return __builtin_bswap32(theValue); }
uint64_t byteSwap(uint64_t theValue) { return __builtin_bswap64(theValue); }

// Reverses the bytes of each of theValues values of type T, in place.
template <typename T> void swapBytes(uint8_t *theData, int64_t theValues) {
  for (int64_t i = 0; i < theValues; ++i) {
    T aValue;
    std::memcpy(&aValue, theData + sizeof(T) * i, sizeof(T));
    aValue = byteSwap(aValue);
    std::memcpy(theData + sizeof(T) * i, &aValue, sizeof(T));
  }
}

const char *nameOrEmpty(const char *theName) { return theName != nullptr ? theName : ""; }

const char *modeLine(int32_t theStatus) {
  switch (theStatus) {
  case CTLRX_RF_OPEN_READ: return "- RASTER FILE IN READ MODE **********************";
  case CTLRX_RF_OPEN_WRITE: return "- RASTER FILE IN WRITE MODE **********************";
  case CTLRX_RF_OPEN_READ_WRITE: return "- RASTER FILE IN READ AND WRITE MODE **********************";
  case CTLRX_RF_OPEN_TIFF_READ: return "- RASTER TIFF FILE IN READ MODE **********************";
  case CTLRX_RF_OPEN_TIFF_WRITE: return "- RASTER TIFF FILE IN WRITE  MODE **********************";
  default: return "- RASTER FILE CLOSE **********************\n\n";
  }
}

} // namespace

// ============================================================ CRasterFileParam

CRasterFileParam::CRasterFileParam() : mMSBF(machineIsMSBF()) {}

void CRasterFileParam::setFromDescription(const char *theFileName, const CDescription &theHeader) {
  mFileName = theFileName != nullptr ? theFileName : "";
  mNrOfLinesPerImage = integerField(theHeader, "NrOfLinesPerImage", 0);
  mNrOfPixelsPerLine = integerField(theHeader, "NrOfPixelsPerLine", 0);
  const CDescriptionField *aCellType = presentField(theHeader, "CellType");
  if (aCellType == nullptr)
    mCellType = CTLRX_CELL_UNKNOWN;
  else if (aCellType->getValueType() == CTLRX_DS_STRING)
    mCellType = fdfCellTypeFromName(aCellType->getString());
  else
    mCellType = integerField(theHeader, "CellType", CTLRX_CELL_UNKNOWN);
  mDataUnits = fdfDataUnitsFromName(stringField(theHeader, "DataUnits"));
  mHeaderOffset = integerField(theHeader, "HeaderOffset", 0);
  mRowPrefix = integerField(theHeader, "RowPrefix", 0);
  mRowSuffix = integerField(theHeader, "RowSuffix", 0);
  mFooterLen = integerField(theHeader, "FooterLen", 0);
  if (presentField(theHeader, "NrOfChannels") != nullptr && fdfIsTracing())
    fdfTraceMessage("fOUND NrOfChannels\n");
  mNrOfChannels = integerField(theHeader, "NrOfChannels", 1);
  mNullCellValue = doubleField(theHeader, "NullCellValue", 0.0);
  mRealScaleFactor = doubleField(theHeader, "RealScaleFactor", 1.0);
  mImaginaryScaleFactor = doubleField(theHeader, "ImaginaryScaleFactor", 1.0);
  const CDescriptionField *aOrder = presentField(theHeader, "BytesOrder");
  if (aOrder == nullptr)
    mMSBF = machineIsMSBF();
  else
    mMSBF = aOrder->getValueType() == CTLRX_DS_STRING && std::strcmp(aOrder->getString(), "MSBF") == 0;
}

void CRasterFileParam::readFromHeader(const char *theFileName) {
  CDescription aHeader;
  fdfReadStandardHeader(theFileName, aHeader);
  setFromDescription(theFileName, aHeader);
}

void CRasterFileParam::storeInDescription(CDescription &theHeader) const {
  storeNumber(theHeader, "NrOfLinesPerImage", mNrOfLinesPerImage);
  storeNumber(theHeader, "NrOfPixelsPerLine", mNrOfPixelsPerLine);
  if (mCellType >= 0 && mCellType < CTLRX_NBR_CELL_TYPES)
    storeText(theHeader, "CellType", fdfCellTypeName(mCellType));
  if (mDataUnits >= 0 && mDataUnits < CTLRX_NBR_DATA_UNITS)
    storeText(theHeader, "DataUnits", fdfDataUnitsName(mDataUnits));
  storeNumber(theHeader, "HeaderOffset", mHeaderOffset);
  storeNumber(theHeader, "RowPrefix", mRowPrefix);
  storeNumber(theHeader, "RowSuffix", mRowSuffix);
  storeNumber(theHeader, "FooterLen", mFooterLen);
  storeNumber(theHeader, "NullCellValue", mNullCellValue);
  storeText(theHeader, "BytesOrder", mMSBF ? "MSBF" : "LSBF");
  storeNumber(theHeader, "NrOfChannels", mNrOfChannels);
  storeNumber(theHeader, "RealScaleFactor", mRealScaleFactor);
  storeNumber(theHeader, "ImaginaryScaleFactor", mImaginaryScaleFactor);
}

// ================================================================= CRasterFile

void CRasterFile::SFileCloser::operator()(FILE *theFile) const {
  if (theFile != nullptr)
    std::fclose(theFile);
}

CRasterFile::CRasterFile() = default;

CRasterFile::~CRasterFile() {
  if (mRasterStatus == CTLRX_RF_CLOSE)
    return;
  fdfTraceMessage("Warning: the raster file %s has not been closed: closing it\n", mFileName.c_str());
  try {
    close();
  } catch (...) {
    // A destructor must not throw; close() has already released the file.
  }
}

// Errors of this module pass through; anything else becomes 913921 after the
// state has been printed.
template <typename F>
auto CRasterFile::guarded(int theLine, F &&theBody) -> decltype(theBody()) {
  try {
    return theBody();
  } catch (const CErrorExceptionManager &) {
    throw;
  } catch (...) {
    raiseUnexpected(theLine);
  }
}

void CRasterFile::raiseUnexpected(int theLine) const {
  const int aErrno = errno;
  char aMessage[CTLRX_MAX_LEN_CONTEXT];
  std::snprintf(aMessage, sizeof(aMessage), "ERROR  %s   %s    FILE=%s   LINE=%d  ERRNO = %d", fdfGetProcessName(),
                fdfGetBanner(), __FILE__, theLine, aErrno);
  print(aMessage);
  fdfRaiseError(CTLRX_ERR_UNEXPECTED_RASTER, aMessage, __FILE__, theLine);
}

// ------------------------------------------------------------------ opening

// Every named opener takes its layout from the raster's header on disk or
// from a loaded description, then opens through openWith.
void CRasterFile::openFromHeader(const char *theFileName, int32_t theMode, bool theLinesReversed,
                                 bool thePixelsReversed) {
  refuseWhenOpen(nameOrEmpty(theFileName));
  CRasterFileParam aParam;
  aParam.readFromHeader(nameOrEmpty(theFileName));
  aParam.mLinesReversed = theLinesReversed;
  aParam.mPixelsReversed = thePixelsReversed;
  openWith(aParam, theMode);
}

void CRasterFile::openFromDescription(const char *theFileName, const CDescription &theHeader, int32_t theMode,
                                      bool theLinesReversed, bool thePixelsReversed) {
  CRasterFileParam aParam;
  aParam.setFromDescription(theFileName, theHeader);
  aParam.mLinesReversed = theLinesReversed;
  aParam.mPixelsReversed = thePixelsReversed;
  openWith(aParam, theMode);
}

void CRasterFile::open_read(const char *theFileName, bool theLinesReversed, bool thePixelsReversed) {
  openFromHeader(theFileName, CTLRX_RF_OPEN_READ, theLinesReversed, thePixelsReversed);
}

void CRasterFile::open_read(const char *theFileName, const CDescription &theHeader, bool theLinesReversed,
                            bool thePixelsReversed) {
  openFromDescription(theFileName, theHeader, CTLRX_RF_OPEN_READ, theLinesReversed, thePixelsReversed);
}

void CRasterFile::open_read(const CRasterFileParam &theParam) { openWith(theParam, CTLRX_RF_OPEN_READ); }

void CRasterFile::open_write(const char *theFileName) { openFromHeader(theFileName, CTLRX_RF_OPEN_WRITE); }

void CRasterFile::open_write(const char *theFileName, const CDescription &theHeader) {
  openFromDescription(theFileName, theHeader, CTLRX_RF_OPEN_WRITE);
}

void CRasterFile::open_write(const CRasterFileParam &theParam) { openWith(theParam, CTLRX_RF_OPEN_WRITE); }

void CRasterFile::open_read_write(const char *theFileName) { openFromHeader(theFileName, CTLRX_RF_OPEN_READ_WRITE); }

void CRasterFile::open_read_write(const char *theFileName, const CDescription &theHeader) {
  openFromDescription(theFileName, theHeader, CTLRX_RF_OPEN_READ_WRITE);
}

void CRasterFile::open_read_write(const CRasterFileParam &theParam) {
  openWith(theParam, CTLRX_RF_OPEN_READ_WRITE);
}

void CRasterFile::refuseWhenOpen(const char *theFileName) const {
  if (mRasterStatus == CTLRX_RF_CLOSE)
    return;
  const char *aName = theFileName != nullptr ? theFileName : "";
  fdfTraceMessage("Error: attempting to open the raster file %s in input mode while it was not closed\n", aName);
  TLRX_RAISE(CTLRX_ERR_FILE_PARSE, aName);
}

// The layout is checked before the data file is touched, so a bad layout
// never truncates an existing file nor leaves the object half open.
void CRasterFile::openWith(const CRasterFileParam &theParam, int32_t theMode) {
  refuseWhenOpen(theParam.mFileName.c_str());
  // A failed opening leaves the object closed, with nothing held.
  struct SUndoOnFailure {
    CRasterFile &mOwner;
    bool mDone;
    ~SUndoOnFailure() {
      if (!mDone)
        mOwner.resetState();
    }
  } aUndo{*this, false};
  guarded(__LINE__, [&] {
    if (theMode != CTLRX_RF_OPEN_READ && theParam.mFileName.empty()) {
      fdfTraceMessage("You have to set the file name in CRasterFileParam \n");
      TLRX_RAISE(CTLRX_ERR_FILE_PARSE, "");
    }
    validateLayout(theParam, theMode);
    openStream(theParam.mFileName.c_str(), theMode);
    if (theMode == CTLRX_RF_OPEN_READ)
      checkFileCoversImage(theParam);
    adoptLayout(theParam, theMode);
    if (fseeko(mFile.get(), static_cast<off_t>(mHeaderLen), SEEK_SET) != 0) {
      fdfTraceMessage("Error: cannot position the file %s on its first record  errno = %d\n", mFileName.c_str(),
                      errno);
      TLRX_RAISE(CTLRX_ERR_FILE_WRITE, mFileName.c_str());
    }
  });
  aUndo.mDone = true;
}

void CRasterFile::validateLayout(const CRasterFileParam &theParam, int32_t theMode) const {
  const char *aName = theParam.mFileName.c_str();
  const auto aOutside = [](int32_t theValue) { return theValue < 1 || theValue > CTLRX_RASTER_FILE_MAX_ROWS; };
  if (aOutside(theParam.mNrOfLinesPerImage) || aOutside(theParam.mNrOfPixelsPerLine)) {
    if (theMode == CTLRX_RF_OPEN_WRITE)
      fdfTraceMessage("mFileName = %s\n", aName);
    if (aOutside(theParam.mNrOfLinesPerImage))
      fdfTraceMessage("mNrOfLinesPerImage = %d\n", theParam.mNrOfLinesPerImage);
    else
      fdfTraceMessage("mNrOfPixelsPerLine = %d\n", theParam.mNrOfPixelsPerLine);
    fdfTraceMessage("CTLRX_RASTER_FILE_MAX_ROWS = %d\n", CTLRX_RASTER_FILE_MAX_ROWS);
    TLRX_RAISE(CTLRX_ERR_FILE_PARSE, aName);
  }
  if (fdfCellTypeSize(theParam.mCellType, nullptr) < 0)
    TLRX_RAISE(CTLRX_ERR_FILE_PARSE, aName);
  if (theParam.mHeaderOffset < 0 || theParam.mRowPrefix < 0 || theParam.mRowSuffix < 0 || theParam.mFooterLen < 0) {
    fdfTraceMessage("Error: negative layout of %s: mHeaderLen = %d mRowPrefix = %d mRowSuffix = %d "
                    "mFooterLen = %d\n",
                    aName, theParam.mHeaderOffset, theParam.mRowPrefix, theParam.mRowSuffix, theParam.mFooterLen);
    TLRX_RAISE(CTLRX_ERR_FILE_PARSE, aName);
  }
  const int64_t aRecordLen = static_cast<int64_t>(theParam.mRowPrefix) +
                             fdfCellLineBytes(theParam.mCellType, theParam.mNrOfPixelsPerLine) +
                             theParam.mRowSuffix;
  if (aRecordLen > INT32_MAX) {
    fdfTraceMessage("Error: record length %lld of %s exceeds %d bytes\n", static_cast<long long>(aRecordLen), aName,
                    INT32_MAX);
    TLRX_RAISE(CTLRX_ERR_FILE_PARSE, aName);
  }
}

void CRasterFile::openStream(const char *theFileName, int32_t theMode) {
  FILE *aFile = nullptr;
  if (theMode == CTLRX_RF_OPEN_READ) {
    // A FIFO would block the open and a device would never end: data files
    // are regular files (or links to them), asked before the open.
    if (fdfExistFile(theFileName) && !fdfIsRegularFile(theFileName)) {
      fdfTraceMessage("Error: %s is not a regular file\n", theFileName);
      TLRX_RAISE_F(CTLRX_ERR_FILE_OPEN, "%s is not a regular file", theFileName);
    }
    aFile = std::fopen(theFileName, "rb");
  } else if (theMode == CTLRX_RF_OPEN_WRITE) {
    fdfTraceMessage("************** CTLRX_RF_OPEN_WRITE : %s\n", theFileName);
    aFile = std::fopen(theFileName, "wb");
  } else {
    struct stat aStat;
    if (stat(theFileName, &aStat) != 0) {
      FILE *aCreated = std::fopen(theFileName, "ab");
      if (aCreated != nullptr)
        std::fclose(aCreated);
    }
    if (stat(theFileName, &aStat) == 0)
      chmod(theFileName, aStat.st_mode | S_IRUSR | S_IWUSR);
    fdfTraceMessage("************** CTLRX_RF_OPEN_READ_WRITE : %s\n", theFileName);
    aFile = std::fopen(theFileName, "r+b");
  }
  if (aFile == nullptr) {
    fdfTraceMessage("Error: cannot open the file: %s  errno = %d\n", theFileName, errno);
    TLRX_RAISE(theMode == CTLRX_RF_OPEN_READ ? CTLRX_ERR_FILE_OPEN : CTLRX_ERR_FILE_WRITE, theFileName);
  }
  mFile.reset(aFile);
  if (!mStreamBuffer)
    mStreamBuffer.reset(new char[CTLRX_RF_STREAM_BUFFER]);
  std::setvbuf(aFile, mStreamBuffer.get(), _IOFBF, CTLRX_RF_STREAM_BUFFER);
  if (theMode == CTLRX_RF_OPEN_READ)
    fdfAdviseSequentialRead(fileno(aFile));
}

void CRasterFile::adoptLayout(const CRasterFileParam &theParam, int32_t theMode) {
  mFileName = theParam.mFileName;
  mRasterStatus = theMode;
  mNrOfLinesPerImage = theParam.mNrOfLinesPerImage;
  mNrOfPixelsPerLine = theParam.mNrOfPixelsPerLine;
  mCellType = theParam.mCellType;
  mBytesPerPixel = fdfCellTypeSize(mCellType, &mDataNbr);
  mDataUnits = theParam.mDataUnits;
  mHeaderLen = theParam.mHeaderOffset;
  mRowPrefix = theParam.mRowPrefix;
  mRowSuffix = theParam.mRowSuffix;
  mFooterLen = theParam.mFooterLen;
  mDummyVal = theParam.mNullCellValue;
  // Stored order differs from the machine's; single-byte values never swap.
  mSwap = theParam.mMSBF != machineIsMSBF() && mBytesPerPixel / mDataNbr >= 2;
  mLinePosition = 0;
  mMaxLineWritten = 0;
  mRecordLen = static_cast<int32_t>(mRowPrefix + fdfCellLineBytes(mCellType, mNrOfPixelsPerLine) + mRowSuffix);
  mRecordBuffer.assign(static_cast<size_t>(mRecordLen), 0);
  mMaxLineSeek = static_cast<int32_t>(CTLRX_RF_SHORT_SEEK_LIMIT / mRecordLen);
  mRealScaleFactor = theParam.mRealScaleFactor;
  mImaginaryScaleFactor = theParam.mImaginaryScaleFactor;
  mScaleFactor = !(mRealScaleFactor == 1.0 && mImaginaryScaleFactor == 1.0);
  mLinesReversed = theParam.mLinesReversed;
  mPixelsReversed = theParam.mPixelsReversed;
  mLastWasWrite = false;
}

// A data file shorter than its header declares is refused at once instead of
// delivering a short image later, and before any buffer is sized by the
// header's numbers.
void CRasterFile::checkFileCoversImage(const CRasterFileParam &theParam) const {
  struct stat aStat;
  if (fstat(fileno(mFile.get()), &aStat) != 0 || !S_ISREG(aStat.st_mode))
    return;
  const int64_t aRecordLen = static_cast<int64_t>(theParam.mRowPrefix) +
                             fdfCellLineBytes(theParam.mCellType, theParam.mNrOfPixelsPerLine) + theParam.mRowSuffix;
  const int64_t aNeeded = theParam.mHeaderOffset + aRecordLen * theParam.mNrOfLinesPerImage;
  const int64_t aSize = static_cast<int64_t>(aStat.st_size);
  if (aSize >= aNeeded)
    return;
  fdfTraceMessage("Error: the file %s holds %lld bytes, its header declares %lld (mHeaderLen = %d, mRecordLen = %lld, "
                  "NrOfLinesPerImage = %d)\n",
                  theParam.mFileName.c_str(), static_cast<long long>(aSize), static_cast<long long>(aNeeded),
                  theParam.mHeaderOffset, static_cast<long long>(aRecordLen), theParam.mNrOfLinesPerImage);
  TLRX_RAISE(CTLRX_ERR_FILE_READ, theParam.mFileName.c_str());
}

void CRasterFile::resetState() {
  mFile.reset();
  mFileName.clear();
  std::vector<uint8_t>().swap(mRecordBuffer);
  std::vector<uint8_t>().swap(mLineBuffer);
  std::vector<uint8_t>().swap(mCacheBlock);
  mCacheLines.clear();
  mCacheLineNumbers.clear();
  mCacheSize = 0;
  mQueued = 0;
  mCacheFirst = mCacheLast = -1;
  mCacheColStart = mCacheColEnd = -1;
  mRasterStatus = CTLRX_RF_CLOSE;
}

// ----------------------------------------------------------------- closing

void CRasterFile::close() {
  if (mRasterStatus < CTLRX_RF_OPEN_READ || mRasterStatus > CTLRX_RF_OPEN_TIFF_WRITE) {
    fdfTraceMessage("mRasterStatus %d\n", mRasterStatus);
    const char *aName = mFileName.empty() ? "no file name" : mFileName.c_str();
    fdfTraceMessage("Error: attempting to close a raster file %s while it was not open\n", aName);
    TLRX_RAISE(CTLRX_ERR_FILE_PARSE, aName);
  }
  // Whatever happens below, the object ends closed and its file released.
  struct SCloseOnExit {
    CRasterFile &mOwner;
    ~SCloseOnExit() { mOwner.resetState(); }
  } aCloseOnExit{*this};
  guarded(__LINE__, [&] {
    freeBuffer();
    if (mRasterStatus == CTLRX_RF_OPEN_WRITE)
      padMissingLines();
    if (mRasterStatus == CTLRX_RF_OPEN_WRITE || mRasterStatus == CTLRX_RF_OPEN_READ_WRITE) {
      FILE *aFile = mFile.release();
      if (std::fclose(aFile) != 0) {
        fdfTraceMessage("Error: impossible to close the file %s  errno = %d\n", mFileName.c_str(), errno);
        TLRX_RAISE(CTLRX_ERR_FILE_WRITE, mFileName.c_str());
      }
    }
  });
}

// Lines never written become zero records; the file always ends with its
// full declared size (cells written through column windows may leave a short
// last record).
void CRasterFile::padMissingLines() {
  if (mMaxLineWritten < mNrOfLinesPerImage) {
    TLRX_SHORT_WARNING(CTLRX_WARN_LINES_PADDED, mFileName.c_str());
    fdfTraceMessage("\nWARNING NULL line writed : %d in file : %s\n", mNrOfLinesPerImage - mMaxLineWritten,
                    mFileName.c_str());
    positionOnRecordOrRaise(mMaxLineWritten, CTLRX_ERR_FILE_WRITE);
    const std::vector<uint8_t> aZeros(std::min<size_t>(CTLRX_RF_PADDING_CHUNK, static_cast<size_t>(mRecordLen) *
                                                           (mNrOfLinesPerImage - mMaxLineWritten)),
                                      0);
    int64_t aRemaining = static_cast<int64_t>(mRecordLen) * (mNrOfLinesPerImage - mMaxLineWritten);
    while (aRemaining > 0) {
      const size_t aBytes = static_cast<size_t>(std::min<int64_t>(aRemaining, static_cast<int64_t>(aZeros.size())));
      writeBytes(aZeros.data(), aBytes, mMaxLineWritten);
      aRemaining -= static_cast<int64_t>(aBytes);
    }
    mLinePosition = mMaxLineWritten = mNrOfLinesPerImage;
  }
  const int64_t aFullSize = recordOffset(mNrOfLinesPerImage);
  struct stat aStat;
  if (std::fflush(mFile.get()) != 0 || fstat(fileno(mFile.get()), &aStat) != 0 ||
      (aStat.st_size < aFullSize && ftruncate(fileno(mFile.get()), static_cast<off_t>(aFullSize)) != 0)) {
    fdfTraceMessage("Error: impossible to complete the file %s to %lld bytes  errno = %d\n", mFileName.c_str(),
                    static_cast<long long>(aFullSize), errno);
    TLRX_RAISE(CTLRX_ERR_FILE_WRITE, mFileName.c_str());
  }
}

// -------------------------------------------------------------- positioning

int64_t CRasterFile::recordOffset(int32_t theRow) const {
  return static_cast<int64_t>(theRow) * mRecordLen + mHeaderLen;
}

bool CRasterFile::seekLinePosition(int32_t theRow) {
  try {
    if (!mFile) {
      fdfTraceMessage("Error: attempting to position the raster file %s while it was not open\n", mFileName.c_str());
      return false;
    }
    if (theRow == mLinePosition)
      return true;
    const int64_t aOffset = recordOffset(theRow);
    if ((mRasterStatus == CTLRX_RF_OPEN_WRITE || mRasterStatus == CTLRX_RF_OPEN_READ_WRITE) &&
        std::fflush(mFile.get()) != 0) {
      fdfTraceMessage("Error: flush before positioning failed on %s  errno = %d\n", mFileName.c_str(), errno);
      return false;
    }
    if (fseeko(mFile.get(), static_cast<off_t>(aOffset), SEEK_SET) != 0) {
      if (aOffset < CTLRX_RF_SHORT_SEEK_LIMIT) {
        fdfTraceMessage("FAIL seek AP : %lld K + %lld\n", static_cast<long long>(aOffset / 1000),
                        static_cast<long long>(aOffset % 1000));
      } else {
        const long long aHere = static_cast<long long>(ftello(mFile.get()));
        fdfTraceMessage("ERROR : _lseeki64 errno = %d\nFILE : %s\nmLinePosition : %d\noffset : %lld K + %lld\n"
                        "this_pos : %lld K + %lld\n",
                        errno, mFileName.c_str(), mLinePosition, static_cast<long long>(aOffset / 1000),
                        static_cast<long long>(aOffset % 1000), aHere / 1000, aHere % 1000);
      }
      mLinePosition = -1;
      return false;
    }
    mLinePosition = theRow;
    return true;
  } catch (const CErrorExceptionManager &) {
    throw;
  } catch (...) {
    const long long aActual = mFile ? static_cast<long long>(ftello(mFile.get())) : -1;
    fdfTraceMessage("seekLinePosition(%d)  actual = %lld diff = %lld\n", theRow, aActual,
                    static_cast<long long>(recordOffset(theRow)) - aActual);
    raiseUnexpected(__LINE__);
  }
}

void CRasterFile::positionOnRecordOrRaise(int32_t theRow, int32_t theCode) {
  if (seekLinePosition(theRow))
    return;
  fdfTraceMessage("theRowStart : %d\n", theRow);
  TLRX_RAISE(theCode, mFileName.c_str());
}

// In update mode the C stream needs a positioning call between a read and a
// write in either order; the record position alone may not trigger one.
void CRasterFile::switchDirection(bool theWriting) {
  if (mRasterStatus != CTLRX_RF_OPEN_READ_WRITE || theWriting == mLastWasWrite)
    return;
  if (fseeko(mFile.get(), 0, SEEK_CUR) != 0) {
    fdfTraceMessage("Error: cannot change direction on %s  errno = %d\n", mFileName.c_str(), errno);
    TLRX_RAISE(theWriting ? CTLRX_ERR_FILE_WRITE : CTLRX_ERR_FILE_READ, mFileName.c_str());
  }
  mLastWasWrite = theWriting;
}

// ------------------------------------------------------------------ checks

// Reading needs a file open for reading, writing one open for writing; both
// need at least one line.
void CRasterFile::checkAccess(int32_t theRowNbr, bool theWriting) const {
  const char *aReason = nullptr;
  if (mRasterStatus == CTLRX_RF_CLOSE)
    aReason = "while it was not open\n";
  else if (mRasterStatus == (theWriting ? CTLRX_RF_OPEN_READ : CTLRX_RF_OPEN_WRITE))
    aReason = theWriting ? "while it was open in read mode\n" : "while it was open in write mode\n";
  else if (theRowNbr <= 0)
    aReason = "a negative or null number of lines\n";
  if (aReason == nullptr)
    return;
  fdfTraceMessage("Error: attempting to %s the raster file %s %s", theWriting ? "write to" : "read from",
                  mFileName.c_str(), aReason);
  TLRX_RAISE(theWriting ? CTLRX_ERR_FILE_WRITE : CTLRX_ERR_FILE_READ, mFileName.c_str());
}

// The block keeps its first line inside the image and never grows: the
// caller's buffer is sized for theRowNbr lines.
void CRasterFile::clampRows(int32_t &theRowStart, int32_t &theRowNbr, const char *theFormat) const {
  const int32_t aLast = mNrOfLinesPerImage - 1;
  if (theRowStart < 0 || theRowStart > aLast) {
    fdfTraceMessage(theFormat, theRowStart);
    theRowStart = std::clamp(theRowStart, 0, aLast);
  }
  const int64_t aRowEnd = static_cast<int64_t>(theRowStart) + theRowNbr - 1;
  if (aRowEnd > aLast) {
    fdfTraceMessage(theFormat, static_cast<int32_t>(std::min<int64_t>(aRowEnd, INT32_MAX)));
    theRowNbr = aLast - theRowStart + 1;
  }
}

void CRasterFile::clampColumns(int32_t &theColStart, int32_t &theColEnd) const {
  const int32_t aLast = mNrOfPixelsPerLine - 1;
  if (mCellType == CTLRX_CELL_BIT) {
    theColStart = 0;
    theColEnd = aLast;
    return;
  }
  for (int32_t *aColumn : {&theColStart, &theColEnd}) {
    if (*aColumn < 0 || *aColumn > aLast) {
      fdfTraceMessage("Requested column %d is outside the image!\n", *aColumn);
      *aColumn = std::clamp(*aColumn, 0, aLast);
    }
  }
}

int64_t CRasterFile::lineBytes(int32_t theColStart, int32_t theColEnd) const {
  if (mCellType == CTLRX_CELL_BIT)
    return fdfBitLineBytes(mNrOfPixelsPerLine);
  return static_cast<int64_t>(theColEnd - theColStart + 1) * mBytesPerPixel;
}

void CRasterFile::swapValues(uint8_t *theData, int64_t theValues) const {
  switch (mBytesPerPixel / mDataNbr) {
  case 2: swapBytes<uint16_t>(theData, theValues); break;
  case 4: swapBytes<uint32_t>(theData, theValues); break;
  case 8: swapBytes<uint64_t>(theData, theValues); break;
  default: break;
  }
}

// ------------------------------------------------------------ byte transfer

void CRasterFile::readBytes(void *theDest, size_t theBytes, int32_t theRow) {
  switchDirection(false);
  const size_t aRead = std::fread(theDest, 1, theBytes, mFile.get());
  if (aRead == theBytes)
    return;
  const int aErrno = errno;
  const bool aEof = std::feof(mFile.get()) != 0;
  const long long aHere = static_cast<long long>(ftello(mFile.get()));
  std::clearerr(mFile.get());
  mLinePosition = -1;
  fdfTraceMessage("Read file  ERROR : STATUS %s %s (read %zu of %zu bytes, errno = %d)\n   CTLRX_RF_CLOSE %d\n"
                  "theRowNbr : %d\nthis_pos : %lld\nthis_pos K : %lld\n(mRecordLen * theRowNbr) %lld\n"
                  "Read file : STATUS %d\n",
                  mFileName.c_str(), aEof ? "end of file" : "read error", aRead, theBytes, aErrno, CTLRX_RF_CLOSE,
                  theRow, aHere, aHere / 1000, static_cast<long long>(mRecordLen) * theRow, mRasterStatus);
  TLRX_RAISE(CTLRX_ERR_FILE_READ, mFileName.c_str());
}

void CRasterFile::writeBytes(const void *theSource, size_t theBytes, int32_t theRow) {
  switchDirection(true);
  if (std::fwrite(theSource, 1, theBytes, mFile.get()) == theBytes)
    return;
  const int aErrno = errno;
  std::clearerr(mFile.get());
  mLinePosition = -1;
  fdfTraceMessage("Error: impossible to write record %d LEN : %zu  on file %s  errno = %d\n", theRow, theBytes,
                  mFileName.c_str(), aErrno);
  TLRX_RAISE(CTLRX_ERR_FILE_WRITE, mFileName.c_str());
}

// ------------------------------------------------------------------ reading

int32_t CRasterFile::readRecords(int32_t theRowStart, int32_t theRowNbr, int32_t theColStart, int32_t theColEnd,
                                 void *theDest, bool theTrace) {
  return guarded(__LINE__, [&] {
    checkReadable(theRowNbr);
    int32_t aRowStart = theRowStart;
    int32_t aRowNbr = theRowNbr;
    int32_t aColStart = theColStart;
    int32_t aColEnd = theColEnd;
    clampRows(aRowStart, aRowNbr, "Requested line %d is outside the image!\n");
    clampColumns(aColStart, aColEnd);
    if (aColStart > aColEnd) {
      fdfTraceMessage("Error: attempting to read from the raster file %s columns %d to %d\n", mFileName.c_str(),
                      aColStart, aColEnd);
      TLRX_RAISE(CTLRX_ERR_FILE_READ, mFileName.c_str());
    }
    if (theTrace)
      fdfTraceMessage("Reading [%d-%d] records [%d]-[%d] from file %s\n", aColStart, aColEnd, aRowStart,
                      aRowStart + aRowNbr - 1, mFileName.c_str());
    readLines(aRowStart, aRowNbr, aColStart, aColEnd, static_cast<uint8_t *>(theDest));
    return aRowNbr;
  });
}

// Lines and columns already inside the image.
void CRasterFile::readLines(int32_t theRowStart, int32_t theRowNbr, int32_t theColStart, int32_t theColEnd,
                            uint8_t *theDest) {
  const int64_t aLineBytes = lineBytes(theColStart, theColEnd);
  const bool aWholeRecords =
      mRowPrefix == 0 && mRowSuffix == 0 && theColStart == 0 && theColEnd == mNrOfPixelsPerLine - 1;
  if (aWholeRecords) {
    if (!seekLinePosition(theRowStart)) {
      fdfTraceMessage("mHeaderLen = %d\ndatalen = %lld\nmBytesPerPixel = %d\nmRecordLen = %d\ntheRowStart = %d\n"
                      "mLinePosition = %d\n",
                      mHeaderLen, static_cast<long long>(aLineBytes) * theRowNbr, mBytesPerPixel, mRecordLen,
                      theRowStart, mLinePosition);
      TLRX_RAISE(CTLRX_ERR_FILE_READ, mFileName.c_str());
    }
    readBytes(theDest, static_cast<size_t>(mRecordLen) * theRowNbr, theRowStart);
    mLinePosition += theRowNbr;
  } else {
    const int64_t aCellOffset = mRowPrefix + static_cast<int64_t>(theColStart) * mBytesPerPixel;
    for (int32_t i = 0; i < theRowNbr; ++i) {
      if (!seekLinePosition(theRowStart + i)) {
        fdfTraceMessage("%d ERROR LOOP BEFORE seekLinePosition  : %d\n", i, theRowStart + i);
        TLRX_RAISE(CTLRX_ERR_FILE_READ, mFileName.c_str());
      }
      readBytes(mRecordBuffer.data(), mRecordBuffer.size(), theRowStart + i);
      std::memcpy(theDest + i * aLineBytes, mRecordBuffer.data() + aCellOffset, static_cast<size_t>(aLineBytes));
      mLinePosition += 1;
    }
  }
  if (mSwap)
    swapValues(theDest, static_cast<int64_t>(theRowNbr) * (aLineBytes / mBytesPerPixel) * mDataNbr);
  mMaxLineWritten = std::max(mMaxLineWritten, theRowStart + theRowNbr);
}

// ------------------------------------------------------------------ writing

int32_t CRasterFile::writeRecords(int32_t theRowStart, int32_t theRowNbr, const void *theSource, int32_t theColStart,
                                  int32_t theColEnd, bool theTrace) {
  return guarded(__LINE__, [&] {
    checkWritable(theRowNbr);
    int32_t aRowStart = theRowStart;
    int32_t aRowNbr = theRowNbr;
    int32_t aColStart = theColStart;
    int32_t aColEnd = theColEnd < 0 ? mNrOfPixelsPerLine - 1 : theColEnd;
    clampRows(aRowStart, aRowNbr, "Request to write line %d outside the image!\n");
    clampColumns(aColStart, aColEnd);
    if (aColStart > aColEnd) {
      fdfTraceMessage("Error: attempting to write to the raster file %s columns %d to %d\n", mFileName.c_str(),
                      aColStart, aColEnd);
      TLRX_RAISE(CTLRX_ERR_FILE_WRITE, mFileName.c_str());
    }
    if (theTrace)
      fdfTraceMessage("Writing records [%d]-[%d] to file %s\n", aRowStart, aRowStart + aRowNbr - 1,
                      mFileName.c_str());
    writeLines(aRowStart, aRowNbr, static_cast<const uint8_t *>(theSource), aColStart, aColEnd);
    return aRowNbr;
  });
}

// The caller's cells are never modified: swapping works on the record buffer.
// Whole lines in write mode go out as whole records (prefix and suffix zero);
// column windows, and every line in update mode, write only their cells.
void CRasterFile::writeLines(int32_t theRowStart, int32_t theRowNbr, const uint8_t *theSource, int32_t theColStart,
                             int32_t theColEnd) {
  positionOnRecordOrRaise(theRowStart, CTLRX_ERR_FILE_WRITE);
  const int64_t aLineBytes = lineBytes(theColStart, theColEnd);
  const int64_t aLineValues = aLineBytes / mBytesPerPixel * mDataNbr;
  const bool aWholeLine = theColStart == 0 && theColEnd == mNrOfPixelsPerLine - 1;
  const int64_t aCellOffset = mRowPrefix + static_cast<int64_t>(theColStart) * mBytesPerPixel;
  uint8_t *aCells = mRecordBuffer.data() + aCellOffset;
  if (aWholeLine && mRowPrefix == 0 && mRowSuffix == 0 && !mSwap) {
    writeBytes(theSource, static_cast<size_t>(mRecordLen) * theRowNbr, theRowStart);
    mLinePosition += theRowNbr;
  } else if (aWholeLine && (mRasterStatus == CTLRX_RF_OPEN_WRITE || (mRowPrefix == 0 && mRowSuffix == 0))) {
    for (int32_t i = 0; i < theRowNbr; ++i) {
      std::memcpy(aCells, theSource + i * aLineBytes, static_cast<size_t>(aLineBytes));
      if (mSwap)
        swapValues(aCells, aLineValues);
      writeBytes(mRecordBuffer.data(), mRecordBuffer.size(), theRowStart + i);
      mLinePosition += 1;
    }
  } else {
    for (int32_t i = 0; i < theRowNbr; ++i) {
      const int64_t aOffset = recordOffset(theRowStart + i) + aCellOffset;
      if (std::fflush(mFile.get()) != 0 || fseeko(mFile.get(), static_cast<off_t>(aOffset), SEEK_SET) != 0) {
        mLinePosition = -1;
        fdfTraceMessage("theRowStart : %d\n", theRowStart + i);
        TLRX_RAISE(CTLRX_ERR_FILE_WRITE, mFileName.c_str());
      }
      mLastWasWrite = true;
      std::memcpy(aCells, theSource + i * aLineBytes, static_cast<size_t>(aLineBytes));
      if (mSwap)
        swapValues(aCells, aLineValues);
      writeBytes(aCells, static_cast<size_t>(aLineBytes), theRowStart + i);
    }
    mLinePosition = -1; // the stream stands inside a record
  }
  if (mRasterStatus == CTLRX_RF_OPEN_READ_WRITE && std::fflush(mFile.get()) != 0) {
    fdfTraceMessage("Error: impossible to write record %d LEN : %lld  on file %s  errno = %d\n", theRowStart,
                    static_cast<long long>(aLineBytes), mFileName.c_str(), errno);
    TLRX_RAISE(CTLRX_ERR_FILE_WRITE, mFileName.c_str());
  }
  mMaxLineWritten = std::max(mMaxLineWritten, theRowStart + theRowNbr);
}

// -------------------------------------------------------------- line cache

bool CRasterFile::setBuffer(int32_t theLines) {
  if (mRasterStatus != CTLRX_RF_OPEN_READ && mRasterStatus != CTLRX_RF_OPEN_WRITE)
    return false;
  freeBuffer();
  if (theLines <= 0)
    return true;
  const int32_t aLines = std::min(theLines, mNrOfLinesPerImage);
  const size_t aLineBytes = static_cast<size_t>(fdfCellLineBytes(mCellType, mNrOfPixelsPerLine));
  mCacheBlock.assign(aLineBytes * static_cast<size_t>(aLines), 0);
  mCacheLines.assign(static_cast<size_t>(aLines), nullptr);
  for (int32_t i = 0; i < aLines; ++i)
    mCacheLines[i] = mCacheBlock.data() + aLineBytes * static_cast<size_t>(i);
  if (mRasterStatus == CTLRX_RF_OPEN_WRITE)
    mCacheLineNumbers.assign(static_cast<size_t>(aLines), -1);
  mCacheSize = aLines;
  mQueued = 0;
  mCacheFirst = mCacheLast = -1;
  mCacheColStart = mCacheColEnd = -1;
  return true;
}

void CRasterFile::flushBuffer() {
  if (mRasterStatus != CTLRX_RF_OPEN_WRITE)
    return;
  // Slots are released one by one, so a failing write leaves only the lines
  // not yet written in the queue.
  int32_t aDone = 0;
  struct SDropWritten {
    CRasterFile &mOwner;
    int32_t &mDone;
    ~SDropWritten() {
      if (mDone == 0)
        return;
      for (int32_t i = mDone; i < mOwner.mQueued; ++i) {
        std::swap(mOwner.mCacheLines[i - mDone], mOwner.mCacheLines[i]);
        mOwner.mCacheLineNumbers[i - mDone] = mOwner.mCacheLineNumbers[i];
      }
      mOwner.mQueued -= mDone;
    }
  } aDrop{*this, aDone};
  for (; aDone < mQueued; ++aDone)
    writeRecords(mCacheLineNumbers[aDone], 1, mCacheLines[aDone], 0, -1);
}

void CRasterFile::freeBuffer() {
  flushBuffer();
  std::vector<uint8_t>().swap(mCacheBlock);
  mCacheLines.clear();
  mCacheLineNumbers.clear();
  mCacheSize = 0;
  mQueued = 0;
  mCacheFirst = mCacheLast = -1;
  mCacheColStart = mCacheColEnd = -1;
}

uint8_t *CRasterFile::lineBuffer() {
  if (mLineBuffer.empty())
    mLineBuffer.assign(static_cast<size_t>(fdfCellLineBytes(mCellType, mNrOfPixelsPerLine)), 0);
  return mLineBuffer.data();
}

// Reads forward from theRow, or backward to it when the lines run reversed,
// so that the lines that follow in the caller's order are the ones cached.
void CRasterFile::refillCache(int32_t theRow, int32_t theColStart, int32_t theColEnd) {
  int32_t aFirst = theRow;
  int32_t aLast = std::min(theRow + mCacheSize - 1, mNrOfLinesPerImage - 1);
  if (mLinesReversed) {
    aFirst = std::max(theRow - mCacheSize + 1, 0);
    aLast = theRow;
  }
  mCacheFirst = mCacheLast = -1;
  readLines(aFirst, aLast - aFirst + 1, theColStart, theColEnd, mCacheBlock.data());
  const int64_t aLineBytes = lineBytes(theColStart, theColEnd);
  for (int32_t i = 0; i <= aLast - aFirst; ++i)
    mCacheLines[i] = mCacheBlock.data() + aLineBytes * i;
  mCacheFirst = aFirst;
  mCacheLast = aLast;
  mCacheColStart = theColStart;
  mCacheColEnd = theColEnd;
}

void *CRasterFile::getLineBuffer(int32_t theRow, int32_t theColStart, int32_t theColEnd) {
  return guarded(__LINE__, [&]() -> void * {
    if (mRasterStatus == CTLRX_RF_OPEN_WRITE)
      return lineBuffer();
    checkReadable(1);
    int32_t aRow = theRow;
    int32_t aRowNbr = 1;
    int32_t aColStart = theColStart;
    int32_t aColEnd = theColEnd < 0 ? mNrOfPixelsPerLine - 1 : theColEnd;
    clampRows(aRow, aRowNbr, "Requested line %d is outside the image!\n");
    clampColumns(aColStart, aColEnd);
    if (aColStart > aColEnd) {
      fdfTraceMessage("Error: attempting to read from the raster file %s columns %d to %d\n", mFileName.c_str(),
                      aColStart, aColEnd);
      TLRX_RAISE(CTLRX_ERR_FILE_READ, mFileName.c_str());
    }
    if (mCacheSize > 0 && mRasterStatus == CTLRX_RF_OPEN_READ) {
      if (aRow < mCacheFirst || aRow > mCacheLast || aColStart != mCacheColStart || aColEnd != mCacheColEnd)
        refillCache(aRow, aColStart, aColEnd);
      return mCacheLines[aRow - mCacheFirst];
    }
    readLines(aRow, 1, aColStart, aColEnd, lineBuffer());
    return lineBuffer();
  });
}

void CRasterFile::putLine(int32_t theRow) {
  checkWritable(1);
  putLine(theRow, lineBuffer());
}

void CRasterFile::putLine(int32_t theRow, const void *theCells) {
  guarded(__LINE__, [&] {
    checkWritable(1);
    if (mCacheSize == 0 || mRasterStatus != CTLRX_RF_OPEN_WRITE) {
      writeRecords(theRow, 1, theCells, 0, -1);
      return;
    }
    if (mQueued == mCacheSize)
      flushBuffer();
    const size_t aLineBytes = static_cast<size_t>(fdfCellLineBytes(mCellType, mNrOfPixelsPerLine));
    if (mCacheLines[mQueued] != theCells)
      std::memcpy(mCacheLines[mQueued], theCells, aLineBytes);
    mCacheLineNumbers[mQueued] = theRow;
    ++mQueued;
  });
}

// ------------------------------------------------------------- typed access

const uint8_t *CRasterFile::typedLineCells(int32_t theRow, int32_t &theColStart, int32_t &theColEnd) {
  if (mRasterStatus != CTLRX_RF_OPEN_READ && mRasterStatus != CTLRX_RF_OPEN_READ_WRITE)
    checkReadable(1);
  if (theColEnd < 0)
    theColEnd = mNrOfPixelsPerLine - 1;
  if (theColStart > theColEnd || theColStart < 0 || theColEnd >= mNrOfPixelsPerLine) {
    print(" ");
    fdfTraceMessage("theColStart : %d\ntheColEnd : %d\nmNrOfPixelsPerLine : %d\n", theColStart, theColEnd,
                    mNrOfPixelsPerLine);
    TLRX_RAISE(CTLRX_ERR_FILE_PARSE, mFileName.c_str());
  }
  const int32_t aFileRow = typedFileRow(theRow);
  if (mPixelsReversed) {
    const int32_t aFirst = mNrOfPixelsPerLine - 1 - theColEnd;
    theColEnd = mNrOfPixelsPerLine - 1 - theColStart;
    theColStart = aFirst;
  }
  return static_cast<const uint8_t *>(getLineBuffer(aFileRow, theColStart, theColEnd));
}

int32_t CRasterFile::typedFileRow(int32_t theRow) const {
  if (theRow < 0 || theRow >= mNrOfLinesPerImage) {
    print(" ");
    fdfTraceMessage("File name : %s\ntheRow : %d\nmNrOfLinesPerImage : %d\n", mFileName.c_str(), theRow,
                    mNrOfLinesPerImage);
    TLRX_RAISE(CTLRX_ERR_FILE_PARSE, mFileName.c_str());
  }
  return mLinesReversed ? mNrOfLinesPerImage - 1 - theRow : theRow;
}

void CRasterFile::requireComplexCells() const {
  if (fdfIsComplexCellType(mCellType))
    return;
  fdfTraceMessage("Error: complex line of the raster file %s, whose cells are %s\n", mFileName.c_str(),
                  fdfCellTypeName(mCellType));
  TLRX_RAISE(CTLRX_ERR_FILE_PARSE, mFileName.c_str());
}

void CRasterFile::failUnknownCellType() const {
  fdfTraceMessage("Cell Type Unknow mCellType =%d\n", mCellType);
  TLRX_RAISE(CTLRX_ERR_FILE_READ, mFileName.c_str());
}

template void CRasterFile::getLine<float>(float *, int32_t, int32_t, int32_t, bool);
template void CRasterFile::getLine<double>(double *, int32_t, int32_t, int32_t, bool);
template void CRasterFile::getComplexLine<float>(std::complex<float> *, int32_t, int32_t, int32_t, uint8_t *);
template void CRasterFile::getComplexLine<double>(std::complex<double> *, int32_t, int32_t, int32_t, uint8_t *);
template void CRasterFile::putComplexLine<float>(int32_t, const std::complex<float> *);
template void CRasterFile::putComplexLine<double>(int32_t, const std::complex<double> *);

void CRasterFile::getValidMask(double *theDest, int32_t *theMask, int32_t theRow, bool theAmplitude) {
  getLine<double>(theDest, theRow, 0, -1, theAmplitude);
  const SNoData aNoData = getNoData();
  for (int32_t i = 0; i < mNrOfPixelsPerLine; ++i)
    theMask[i] = aNoData.isNull(theDest[i]) ? 0 : 1;
}

// ----------------------------------------------------------------- printing

void CRasterFile::print(const char *theLabel) const {
  if (!fdfIsTracing())
    return;
  fdfTraceMessage(" this           = %p\n", static_cast<const void *>(this));
  fdfTraceMessage("\n\n ********************** %s%s\n", theLabel != nullptr ? theLabel : "",
                  modeLine(mRasterStatus));
  fdfTraceMessage(" CellType       = %s\n", fdfCellTypeName(mCellType));
  fdfTraceMessage(" mDataUnits     = %s\n", fdfDataUnitsName(mDataUnits));
  fdfTraceMessage(" mDummyVal      = %g\n", mDummyVal);
  fdfTraceMessage(" mHeaderLen     = %d\n", mHeaderLen);
  fdfTraceMessage(" mRecordLen     = %d\n", mRecordLen);
  fdfTraceMessage(" mRowPrefix     = %d\n", mRowPrefix);
  fdfTraceMessage(" mRowSuffix     = %d\n", mRowSuffix);
  fdfTraceMessage(" mFooterLen     = %d\n", mFooterLen);
  fdfTraceMessage(" mLinePosition  = %d\n", mLinePosition);
  fdfTraceMessage(" mBytesPerPixel = %d\n", mBytesPerPixel);
  fdfTraceMessage(" mDataNbr       = %d\n", mDataNbr);
  fdfTraceMessage(" mMaxLineWritten = %d\n", mMaxLineWritten);
  fdfTraceMessage(" mMaxLineSeek   = %d\n", mMaxLineSeek);
  fdfTraceMessage(" NrOfPixelsPerLine   = %d\n", mNrOfPixelsPerLine);
  fdfTraceMessage(" NrOfLinesPerImage   = %d\n", mNrOfLinesPerImage);
  fdfTraceMessage(" mRealScaleFactor   = %g\n", mRealScaleFactor);
  fdfTraceMessage(" mImaginaryScaleFactor   = %g\n", mImaginaryScaleFactor);
  fdfTraceMessage(" mScaleFactor   = %d\n", mScaleFactor ? 1 : 0);
  fdfTraceMessage(mLinesReversed ? "Lines time direction : DECREASE\n" : "Lines time direction : INCREASE\n");
  fdfTraceMessage(mPixelsReversed ? "Pixels time direction : DECREASE\n" : "Pixels time direction : INCREASE\n");
  fdfTraceMessage(mSwap ? " Swap DATA\n" : " Normal DATA\n");
  fdfTraceMessage("\n\n *****************************************************************************\n\n");
}
