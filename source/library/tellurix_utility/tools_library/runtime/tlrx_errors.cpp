// Numbered errors: catalogues, text lookup, the exception record, raising
// and the error file shared with the host.
#include "tlrx_errors.h"

#include "tlrx_enviroment.h"
#include "tlrx_generic_utility.h"
#include "tlrx_platform.h"

#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <unistd.h>

namespace {

constexpr const char *CTLRX_INIT_ERROR_TEXT = "AN ERROR OCCUR DURING Tellurix INIT";
constexpr const char *CTLRX_WRONG_CODE_TEXT = "GENERIC ERROR WRONG CODE";
constexpr int CTLRX_ERROR_FILE_CHARS = CTLRX_MAX_LEN_IN_ERROR * CTLRX_MAX_LINE_IN_ERROR;

int32_t sWarningCount = 0;
bool sReporting = false;

void fdfCopyText(char *theOut, size_t theSize, const char *theText) {
  std::snprintf(theOut, theSize, "%s", theText != nullptr ? theText : "");
}

// Catalogue lines are split on blank, tab and comma for the first token.
std::string fdfFirstToken(const std::string &theLine) {
  const size_t aStart = theLine.find_first_not_of(" \t,\n");
  if (aStart == std::string::npos)
    return std::string();
  const size_t aEnd = theLine.find_first_of(" \t,\n", aStart);
  return theLine.substr(aStart, aEnd == std::string::npos ? std::string::npos : aEnd - aStart);
}

bool fdfParseCount(const std::string &theLine, int32_t &theValue) {
  char *aEnd = nullptr;
  errno = 0;
  const long aValue = std::strtol(theLine.c_str(), &aEnd, 10);
  if (aEnd == theLine.c_str() || errno != 0 || aValue < 0 || aValue > 1000000)
    return false;
  theValue = static_cast<int32_t>(aValue);
  return true;
}

// The block of a class starts at the first line whose first token, taken
// between "[" and "]", begins with "ErrorCodeInfo_<class>".
long fdfFindBlock(const std::vector<std::string> &theLines, size_t theFrom, const std::string &theKey) {
  for (size_t i = theFrom; i < theLines.size(); ++i) {
    std::string aToken = fdfFirstToken(theLines[i]);
    if (!aToken.empty() && aToken[0] == '[')
      aToken.erase(0, 1);
    const size_t aClose = aToken.find(']');
    if (aClose != std::string::npos)
      aToken.erase(aClose);
    if (aToken.compare(0, theKey.size(), theKey) == 0)
      return static_cast<long>(i);
  }
  return -1;
}

bool fdfSecondaryInRange(const CErrorCatalogue &theCatalogue, int32_t thePEC, int32_t theSEC) {
  return thePEC >= 0 && thePEC < theCatalogue.mPECNbr && theSEC >= 0 && theSEC < theCatalogue.mSECNbr[thePEC];
}

} // namespace

bool CErrorCatalogue::load(const char *thePath) {
  clear();
  const std::vector<std::string> aLines = fdfReadLineList(thePath, true);
  int32_t aCount = 0;
  if (aLines.empty() || !fdfParseCount(aLines[0], aCount))
    return false;
  const size_t aFirstBlockLine = 2 * static_cast<size_t>(aCount) + 3;
  if (aFirstBlockLine > aLines.size())
    return false;
  std::vector<std::string> aClassIds(aCount);
  for (int32_t i = 0; i < aCount; ++i) {
    aClassIds[i] = fdfFirstToken(aLines[2 + i]);
    mPrimaryTexts.push_back(aLines[aCount + 3 + i]);
  }
  mSECNbr.assign(aCount, 0);
  mSecondaryTexts.assign(aCount, {});
  for (int32_t i = 0; i < aCount; ++i) {
    const long aBlock = fdfFindBlock(aLines, aFirstBlockLine, "ErrorCodeInfo_" + aClassIds[i]);
    if (aBlock < 0)
      continue;
    int32_t aSecCount = 0;
    const size_t aCountLine = static_cast<size_t>(aBlock) + 1;
    // A count larger than the lines that follow is a malformed catalogue.
    if (aCountLine >= aLines.size() || !fdfParseCount(aLines[aCountLine], aSecCount) ||
        aSecCount > static_cast<int32_t>(aLines.size() - aCountLine - 1)) {
      clear();
      return false;
    }
    for (int32_t k = 0; k < aSecCount; ++k)
      mSecondaryTexts[i].push_back(aLines[aCountLine + 1 + k].substr(0, CTLRX_MAX_LEN_CATALOGUE_TEXT));
    mSECNbr[i] = aSecCount;
  }
  mPECNbr = aCount;
  return true;
}

void CErrorCatalogue::clear() {
  mPECNbr = 0;
  mPrimaryTexts.clear();
  mSECNbr.clear();
  mSecondaryTexts.clear();
}

CErrorCatalogue &fdfErrorCatalogue() {
  static CErrorCatalogue sCatalogue;
  return sCatalogue;
}

CErrorCatalogue &fdfWarningCatalogue() {
  static CErrorCatalogue sCatalogue;
  return sCatalogue;
}

void fdfLookupErrorTexts(const CErrorCatalogue &theCatalogue, int32_t theCode, char *thePrimary,
                         char *theSecondary) {
  const int32_t aPEC = fdfGetPEC(theCode);
  const int32_t aSEC = fdfGetSEC(theCode);
  if (theCatalogue.empty()) {
    fdfCopyText(thePrimary, CTLRX_MAX_LEN_ERROR_TEXT, CTLRX_INIT_ERROR_TEXT);
    theSecondary[0] = '\0';
    return;
  }
  const bool aKnownClass = aPEC >= 0 && aPEC < theCatalogue.mPECNbr;
  fdfCopyText(thePrimary, CTLRX_MAX_LEN_ERROR_TEXT,
              aKnownClass ? theCatalogue.mPrimaryTexts[aPEC].c_str() : CTLRX_WRONG_CODE_TEXT);
  if (!fdfSecondaryInRange(theCatalogue, aPEC, aSEC)) {
    fdfTraceMessage("  EC = %d  PEC = %d  SEC = %d\n", theCode, aPEC, aSEC);
    fdfCopyText(theSecondary, CTLRX_MAX_LEN_ERROR_TEXT, aSEC < 0 ? "" : CTLRX_WRONG_CODE_TEXT);
    return;
  }
  fdfCopyText(theSecondary, CTLRX_MAX_LEN_ERROR_TEXT, theCatalogue.mSecondaryTexts[aPEC][aSEC].c_str());
}

void fdfErrorFilePrimaryText(const CErrorCatalogue &theCatalogue, int32_t theCode, char *theOut) {
  const int32_t aPEC = fdfGetPEC(theCode);
  if (theCatalogue.empty())
    std::snprintf(theOut, CTLRX_MAX_LEN_ERROR_TEXT, "%s  : [%d]", CTLRX_INIT_ERROR_TEXT, theCode);
  else if (aPEC < 0 || aPEC >= theCatalogue.mPECNbr)
    std::snprintf(theOut, CTLRX_MAX_LEN_ERROR_TEXT, "%s  :  %d [PEC %d]", CTLRX_WRONG_CODE_TEXT, theCode, aPEC);
  else
    fdfCopyText(theOut, CTLRX_MAX_LEN_ERROR_TEXT, theCatalogue.mPrimaryTexts[aPEC].c_str());
}

void fdfErrorFileSecondaryText(const CErrorCatalogue &theCatalogue, int32_t theCode, char *theOut) {
  const int32_t aPEC = fdfGetPEC(theCode);
  const int32_t aSEC = fdfGetSEC(theCode);
  if (theCatalogue.empty()) {
    std::snprintf(theOut, CTLRX_MAX_LEN_ERROR_TEXT, "%s  : [%d]", CTLRX_INIT_ERROR_TEXT, theCode);
  } else if (aSEC < 0) {
    theOut[0] = '\0';
  } else if (!fdfSecondaryInRange(theCatalogue, aPEC, aSEC)) {
    fdfTraceMessage("******** aActPEC = %d\n******** mPECNbr = %d\n******** aActSEC = %d\n", aPEC,
                    theCatalogue.mPECNbr, aSEC);
    fdfTraceMessage("******** mSECNbr[aActPEC] = %d\n",
                    aPEC >= 0 && aPEC < theCatalogue.mPECNbr ? theCatalogue.mSECNbr[aPEC] : 0);
    std::snprintf(theOut, CTLRX_MAX_LEN_ERROR_TEXT, "%s  :  %d [%d : %d]", CTLRX_WRONG_CODE_TEXT, theCode, aPEC,
                  aSEC);
  } else {
    fdfCopyText(theOut, CTLRX_MAX_LEN_ERROR_TEXT, theCatalogue.mSecondaryTexts[aPEC][aSEC].c_str());
  }
}

CErrorExceptionManager::CErrorExceptionManager(int32_t theCode, int32_t theLine, const char *theFile,
                                               const char *theContext, const char *theMessage)
    : mLine(theLine), mCode(theCode), mPrimaryCode(fdfGetPEC(theCode)), mSecondaryCode(fdfGetSEC(theCode)) {
  fdfCopyText(mContext, sizeof mContext, theContext);
  fdfCopyText(mFile, sizeof mFile, theFile);
  fdfCopyText(mMessage, sizeof mMessage, theMessage);
  fdfLookupErrorTexts(fdfErrorCatalogue(), theCode, mPrimaryText, mSecondaryText);
}

int32_t fdfGetWarningCount() { return sWarningCount; }
void fdfResetWarningCount() { sWarningCount = 0; }

void fdfRaiseError(int32_t theCode, const char *theMessage, const char *theFile, int theLine) {
  const int aErrno = errno;
  // A failure while an error is being reported must not report again.
  if (sReporting)
    fdfExitProcess(theCode);
  CErrorExceptionManager aError(theCode, theLine, theFile, fdfGetProcessName(), theMessage);
  aError.mErrno = aErrno;
  throw aError;
}

int fdfReportError(const CErrorExceptionManager &theError) {
  const int32_t aCode = theError.mCode;
  if (sReporting || !fdfEnvironmentExists())
    return fdfExitStatus(aCode);
  sReporting = true;
  char aPrimary[CTLRX_MAX_LEN_ERROR_TEXT];
  char aSecondary[CTLRX_MAX_LEN_ERROR_TEXT];
  fdfLookupErrorTexts(fdfErrorCatalogue(), aCode, aPrimary, aSecondary);
  const char *aMessage = theError.mMessage;
  if (aCode == 0)
    fdfRemoveFile(fdfGetWorkingFilePath().c_str());
  else
    fdfWriteErrorFile(aCode, aMessage, static_cast<const char *>(nullptr));
  fdfTraceMessage("\nERROR : %s [%s] (%s) \n %s   %s\n    FILE=%s   LINE=%d  (errno = %d)", aPrimary, aSecondary,
                  aMessage, theError.mContext, fdfGetBanner(), theError.mFile, theError.mLine, theError.mErrno);
  if (aCode != 0)
    fdfLogMessage("\n\n%s [ERROR ID : %d]\n  %s [%s]\n  %s \n\n", fdfGetBanner(), aCode, aPrimary, aSecondary,
                  aMessage);
  else
    fdfLogMessage("\n\nSUCCESSFULL\n\n\n");
  const int32_t aFinal = fdfEndProcess(aCode, true, true);
  fdfDeleteEnvironment();
  sReporting = false;
  return fdfExitStatus(aFinal);
}

void fdfRaiseErrorF(int32_t theCode, const char *theFile, int theLine, const char *theFormat, ...) {
  char aMessage[CTLRX_MAX_LEN_MESSAGE];
  va_list aArgs;
  va_start(aArgs, theFormat);
  std::vsnprintf(aMessage, sizeof aMessage, theFormat, aArgs);
  va_end(aArgs);
  fdfRaiseError(theCode, aMessage, theFile, theLine);
}

namespace {

void fdfWarningTrace(const char *thePrimary, const char *theSecondary, const char *theMessage, const char *theFile,
                     int theLine, int theErrno) {
  fdfTraceMessage("\nWARNING : %s [%s] (%s) \n %s   %s\n    FILE=%s   LINE=%d  (errno = %d)", thePrimary,
                  theSecondary, theMessage, fdfGetProcessName(), fdfGetBanner(), theFile, theLine, theErrno);
}

} // namespace

void fdfRaiseWarning(int32_t theCode, const char *theMessage, const char *theFile, int theLine) {
  const int aErrno = errno;
  const char *aMessage = theMessage != nullptr ? theMessage : "";
  char aPrimary[CTLRX_MAX_LEN_ERROR_TEXT];
  char aSecondary[CTLRX_MAX_LEN_ERROR_TEXT];
  fdfLookupErrorTexts(fdfErrorCatalogue(), theCode, aPrimary, aSecondary);
  fdfWarningTrace(aPrimary, aSecondary, aMessage, theFile, theLine, aErrno);
  fdfLogMessage("\nWARNING : [ERROR ID : %d]%s [%s] (%s) \n %s   %s\n    FILE=%s   LINE=%d  (errno = %d)", theCode,
                aPrimary, aSecondary, aMessage, fdfGetProcessName(), fdfGetBanner(), theFile, theLine, aErrno);
  ++sWarningCount;
}

void fdfRaiseShortWarning(int32_t theCode, const char *theMessage, const char *theFile, int theLine) {
  const int aErrno = errno;
  const char *aMessage = theMessage != nullptr ? theMessage : "";
  char aPrimary[CTLRX_MAX_LEN_ERROR_TEXT];
  char aSecondary[CTLRX_MAX_LEN_ERROR_TEXT];
  fdfLookupErrorTexts(fdfWarningCatalogue(), theCode, aPrimary, aSecondary);
  fdfWarningTrace(aPrimary, aSecondary, aMessage, theFile, theLine, aErrno);
  fdfLogMessage("\n\nWARNING : [ERROR ID : %d] %s [%s]\n  %s \n\n", theCode, aPrimary, aSecondary, aMessage);
  ++sWarningCount;
}

namespace {

const std::string sBlockTail = "\n" + std::string(66, ' ') + "\n" + std::string(66, ' ') + "\n";

// The status lines shared by the error file, the working file and the
// standard error stream: texts and wrapped messages.
std::string fdfErrorBlock(int32_t theCode, const std::vector<const char *> &theMessages) {
  char aText[CTLRX_MAX_LEN_ERROR_TEXT];
  std::string aBlock;
  fdfErrorFilePrimaryText(fdfErrorCatalogue(), theCode, aText);
  aBlock += aText;
  aBlock += "\n";
  fdfErrorFileSecondaryText(fdfErrorCatalogue(), theCode, aText);
  char aCode[32];
  std::snprintf(aCode, sizeof aCode, " [EC :%d]", theCode);
  aBlock += std::string(aText) + aCode + "\n";

  int aTotLen = 0;
  int aStartedLines = 0;
  for (const char *aMessage : theMessages) {
    if (aStartedLines >= CTLRX_MAX_LINE_IN_ERROR)
      break;
    ++aStartedLines;
    const int aMsgLen = static_cast<int>(std::strlen(aMessage));
    std::string aWrapped;
    int aCopied = 0;
    for (int k = 0; k < aMsgLen && aTotLen + aCopied + 1 < CTLRX_ERROR_FILE_CHARS; ++k) {
      if (aMsgLen > CTLRX_MAX_LEN_IN_ERROR && k > 0 && k % CTLRX_MAX_LEN_IN_ERROR == 0 && aMsgLen - k > 5) {
        aWrapped += '\n';
        ++aStartedLines;
      }
      aWrapped += aMessage[k];
      ++aCopied;
    }
    if (theCode >= CTLRX_ERR_WORKING_FILE_REMOVE && theCode <= CTLRX_ERR_FILE_RENAME && aWrapped.size() >= 4 &&
        aWrapped.compare(aWrapped.size() - 4, 4, "_hdr") == 0)
      aWrapped.replace(aWrapped.size() - 4, 4, ".sml");
    fdfTraceMessage("(aTotLen + aLen) [%d]\n(CTLRX_MAX_LEN_IN_ERROR * CTLRX_MAX_LINE_IN_ERROR) [%d]\n",
                    aTotLen + aCopied, CTLRX_ERROR_FILE_CHARS);
    if (aTotLen + aCopied < CTLRX_ERROR_FILE_CHARS)
      aBlock += aWrapped + "\n";
    aTotLen += aCopied;
  }
  return aBlock;
}

bool fdfWriteWholeFile(const std::string &thePath, const std::string &theText) {
  const int aFd = open(thePath.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
  if (aFd < 0)
    return false;
  const bool aOk = write(aFd, theText.data(), theText.size()) == static_cast<ssize_t>(theText.size());
  close(aFd);
  return aOk;
}

std::string fdfReadWorkingLine(FILE *theFile) {
  char aLine[CTLRX_MAX_LEN_WORKING_LINE + 1];
  if (std::fgets(aLine, sizeof aLine, theFile) == nullptr)
    return std::string();
  aLine[std::strcspn(aLine, "\r\n")] = '\0';
  return aLine;
}

// Rewrites the working file with the error status; falls back to a "_tmp"
// file beside it when the working file cannot be opened.
bool fdfWriteWorkingStatus(int32_t theCode, const std::string &theBlock) {
  const std::string &aPath = fdfGetWorkingFilePath();
  // No batch or working folder known: a "_tmp" would land in whatever
  // folder the run was started from.
  if (aPath.empty())
    return false;
  // Only a working file that existed is waited for; nobody watches one
  // that never did.
  const int aAttempts = fdfWorkingFileSeen() ? 10 : 1;
  FILE *aFile = nullptr;
  for (int aAttempt = 0; aAttempt < aAttempts; ++aAttempt) {
    aFile = std::fopen(aPath.c_str(), "r+");
    if (aFile != nullptr)
      break;
    if (aAttempts > 1)
      fdfSleep(aAttempt);
  }
  if (aFile == nullptr)
    return fdfWriteWholeFile(aPath + "_tmp", theBlock);
  fdfReadWorkingLine(aFile);
  const std::string aSecond = fdfReadWorkingLine(aFile);
  std::rewind(aFile);
  const std::string aText =
      std::string(theCode == CTLRX_WARNING_STATUS ? "-2" : "-1") + "\n" + aSecond + "\n" + theBlock;
  const bool aOk = std::fwrite(aText.data(), 1, aText.size(), aFile) == aText.size();
  std::fflush(aFile);
  // Older, longer content must not survive behind the new status.
  if (ftruncate(fileno(aFile), static_cast<off_t>(aText.size())) != 0) {
  }
  std::fclose(aFile);
  return aOk;
}

} // namespace

bool fdfWriteErrorFile(int32_t theCode, ...) {
  std::vector<const char *> aMessages;
  va_list aArgs;
  va_start(aArgs, theCode);
  for (const char *aMessage = va_arg(aArgs, const char *); aMessage != nullptr; aMessage = va_arg(aArgs, const char *))
    aMessages.push_back(aMessage);
  va_end(aArgs);
  const std::string aBlock = fdfErrorBlock(theCode, aMessages);
  fdfWriteWholeFile(fdfGetWorkingFilePath() + "_error", "-1\n" + aBlock + sBlockTail);
  const bool aOk = fdfWriteWorkingStatus(theCode, aBlock + sBlockTail);
  std::fputs(aBlock.c_str(), stderr);
  return aOk;
}
