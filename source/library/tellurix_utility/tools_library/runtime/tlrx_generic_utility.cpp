// Small services shared by the runtime and the commands.
#include "tlrx_generic_utility.h"

#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_platform.h"

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <climits>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fcntl.h>
#include <memory>
#include <new>
#include <sys/stat.h>
#include <unistd.h>

namespace {

// Companions of a raster N, removed with it in this order.
const char *const sCompanionSuffixes[] = {
    "_hdr", ".hdr", ".sml", "_orb.sml", ".xls", ".shx", ".shp", ".shp.sml", ".kml", ".shp_hdr", ".shp.hdr",
    ".dbf", ".xml", ".txt", ".old.hdr", ".old.sml", "_old.hdr", "_old.sml", ".TellurixParameterExtracted",
    ".TellurixParameterExtracted.sml"};
const char *const sStemSuffixes[] = {"_raw", "_slc", "_gr"};
const char *const sStemCompanions[] = {".TellurixParameterExtracted.sml", ".hdr"};
const char *const sHeaderCompanions[] = {"_hdr.old.hdr", "_hdr.old.sml", "_tmp_hdr.hdr",
                                           "_tmp_hdr.sml", "_hdr_tmp.hdr", "_hdr_tmp.sml"};

bool fdfEndsWith(const std::string &theText, const char *theSuffix) {
  const size_t aLen = std::strlen(theSuffix);
  return theText.size() >= aLen && theText.compare(theText.size() - aLen, aLen, theSuffix) == 0;
}

void fdfRemoveIfExists(const std::string &theName) {
  if (fdfExistFile(theName.c_str()))
    fdfRemoveFile(theName.c_str());
}

void fdfDeleteCompanions(const std::string &theName) {
  for (const char *aSuffix : sCompanionSuffixes)
    fdfRemoveIfExists(theName + aSuffix);
  for (const char *aStemSuffix : sStemSuffixes) {
    if (!fdfEndsWith(theName, aStemSuffix))
      continue;
    const std::string aStem = theName.substr(0, theName.size() - std::strlen(aStemSuffix));
    for (const char *aSuffix : sStemCompanions)
      fdfRemoveIfExists(aStem + aSuffix);
  }
  for (const char *aSuffix : sHeaderCompanions)
    fdfRemoveIfExists(theName + aSuffix);
}

std::string fdfHdrToSml(const std::string &theName) {
  return fdfEndsWith(theName, "_hdr") ? theName.substr(0, theName.size() - 4) + ".sml" : theName;
}

bool fdfCopyContents(const std::string &theSource, const std::string &theDest) {
  const int aIn = open(theSource.c_str(), O_RDONLY | O_CLOEXEC);
  if (aIn < 0)
    return false;
  const int aOut = open(theDest.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
  if (aOut < 0) {
    const int aError = errno;
    close(aIn);
    errno = aError;
    return false;
  }
  char aBuffer[1 << 16];
  bool aOk = true;
  for (ssize_t aRead; (aRead = read(aIn, aBuffer, sizeof aBuffer)) != 0;) {
    if (aRead < 0 || write(aOut, aBuffer, static_cast<size_t>(aRead)) != aRead) {
      aOk = false;
      break;
    }
  }
  const int aError = errno;
  close(aIn);
  if (close(aOut) != 0)
    aOk = false;
  errno = aError;
  return aOk;
}

void fdfNewHandler() { fdfAllocationFailure(0); }

} // namespace

bool fdfExistFile(const char *theName) {
  if (theName == nullptr || theName[0] == '\0' || std::strcmp(theName, "NotOK") == 0)
    return false;
  struct stat aStat;
  return stat(theName, &aStat) == 0;
}

long long fdfGetFileSize(const char *theName) {
  struct stat aStat;
  if (theName == nullptr || stat(theName, &aStat) != 0)
    return -1;
  return static_cast<long long>(aStat.st_size);
}

// A link goes, not its target; a directory stays, mode and all.
bool fdfRemoveFile(const char *theName) { return fdfRemoveFileEntry(theName) == 0; }

bool fdfDeleteRaster(const char *theName, bool theWithCompanions, bool theDeleteFile) {
  bool aRemoved = false;
  if (theDeleteFile)
    aRemoved = fdfRemoveFile(theName);
  if (theWithCompanions)
    fdfDeleteCompanions(theName);
  return aRemoved;
}

void fdfCopyFile(const char *theSource, const char *theDest, bool theKeepGoing) {
  std::string aSource(theSource);
  std::string aDest(theDest);
  if (!fdfExistFile(theSource) && !theKeepGoing) {
    aSource = fdfHdrToSml(aSource);
    aDest = fdfHdrToSml(aDest);
    fdfTraceMessage("Src : %s\nDest : %s\n", aSource.c_str(), aDest.c_str());
  }
  if (fdfExistFile(aDest.c_str()))
    fdfRemoveFile(aDest.c_str());
  if (fdfCopyContents(aSource, aDest))
    return;
  const int aError = errno;
  fdfTraceMessage("Source file name : %s\nDest file name : %s\n", aSource.c_str(), aDest.c_str());
  if (theKeepGoing)
    return;
  TLRX_RAISE_F(CTLRX_ERR_FILE_COPY, "ERROR CODE %d [%s];    %s", aError, std::strerror(aError), aSource.c_str());
}

unsigned long long fdfGetMemoryStatus(bool theTrace) {
  const STLRXMemoryStatus aStatus = fdfReadMemoryStatus();
  if (theTrace && fdfIsTracing())
    fdfTraceMessage("\n Memory Status :\n Memory Load     = %llu\n Total Phys      = %llu\n Avail Phys      = %llu\n"
                    " Total Page File = %llu\n Avail Page File = %llu\n Total Virtual   = %llu\n"
                    " Avail Virtual   = %llu\n",
                    aStatus.mLoadPercent, aStatus.mTotalPhys, aStatus.mAvailPhys, aStatus.mTotalPageFile,
                    aStatus.mAvailPageFile, aStatus.mTotalVirtual, aStatus.mAvailVirtual);
  return aStatus.mTotalPhys;
}

void fdfInstallAllocationFailureHandler() { std::set_new_handler(fdfNewHandler); }

void fdfAllocationFailure(unsigned long long theSize) {
  // Reporting needs a little memory of its own: stop asking for more first.
  std::set_new_handler(nullptr);
  fdfTraceMessage(" Memory Not Found size KB = %llu\n Memory Not Found size = %llu\n", theSize / 1000, theSize);
  fdfGetMemoryStatus(true);
  TLRX_RAISE_F(CTLRX_ERR_ALLOCATION, "%ld,%ld", static_cast<long>(theSize / 1000), static_cast<long>(theSize));
}

int NTLRX_UTILITY_SpawnDeleteFile(const char *theName) {
  fdfTraceMessage("\nNTLRX_UTILITY_SpawnDeleteFile(%s) ", theName);
  std::string aExeDir;
  fdfGetEnvVar(aExeDir, "TELLURIX_EXE_DIR");
  const std::string aExe = aExeDir + "main_delete_file";
  return fdfSpawnDetached(aExe.c_str(), "main_delete_file", theName);
}

namespace {

std::string fdfTrim(const std::string &theLine) {
  const size_t aStart = theLine.find_first_not_of(' ');
  if (aStart == std::string::npos)
    return std::string();
  return theLine.substr(aStart, theLine.find_last_not_of(' ') - aStart + 1);
}

std::string fdfFindListFile(const char *theFileName) {
  if (fdfExistFile(theFileName))
    return theFileName;
  const std::string aName(theFileName != nullptr ? theFileName : "");
  const size_t aSlash = aName.find_last_of("/\\");
  const std::string aInWorkingDir =
      fdfGetRequiredEnvVar("TELLURIX_WORKING_DIR") + (aSlash == std::string::npos ? aName : aName.substr(aSlash + 1));
  if (fdfExistFile(aInWorkingDir.c_str()))
    return aInWorkingDir;
  TLRX_RAISE(CTLRX_ERR_FILE_OPEN, aName.c_str());
}

} // namespace

std::vector<std::string> fdfReadLineList(const char *theFileName, bool theTrim) {
  const std::string aPath = fdfFindListFile(theFileName);
  if (!fdfIsRegularFile(aPath.c_str()))
    TLRX_RAISE_F(CTLRX_ERR_FILE_OPEN, "%s is not a regular file", aPath.c_str());
  std::unique_ptr<FILE, int (*)(FILE *)> aFile(std::fopen(aPath.c_str(), "r"), std::fclose);
  if (!aFile)
    TLRX_RAISE(CTLRX_ERR_FILE_OPEN, aPath.c_str());
  std::vector<std::string> aLines;
  std::string aLine;
  int aChar = 0;
  while (aChar != EOF) {
    aLine.clear();
    bool aAny = false;
    // Characters past the 10000th of a line are dropped, not read as a new line.
    while ((aChar = std::fgetc(aFile.get())) != EOF && aChar != '\n') {
      aAny = true;
      if (aChar != '\r' && aLine.size() < CTLRX_MAX_LEN_LIST_LINE)
        aLine += static_cast<char>(aChar);
    }
    if (aChar == EOF && !aAny)
      break;
    if (!aLine.empty() && aLine[0] == '#')
      break;
    aLines.push_back(theTrim ? fdfTrim(aLine) : aLine);
  }
  return aLines;
}

std::vector<std::string> fdfReadArgumentFile(const char *theArgument) {
  std::string aPath(theArgument != nullptr ? theArgument : "");
  const size_t aTrailer = aPath.find("###Tellurix###");
  if (aTrailer != std::string::npos)
    aPath.erase(aTrailer);
  std::vector<std::string> aLines = fdfReadLineList(aPath.c_str(), true);
  if (aLines.size() < 2)
    TLRX_RAISE(CTLRX_ERR_FILE_OPEN, aPath.c_str());
  aLines.erase(aLines.begin());
  return aLines;
}

std::vector<std::string> fdfReadNameList(const char *theFileName) {
  std::vector<std::string> aNames = fdfReadLineList(theFileName, true);
  aNames.erase(std::remove(aNames.begin(), aNames.end(), std::string()), aNames.end());
  return aNames;
}

int fdfTemporaryOwner(const std::string &theFinalBase, const char *theTag, int theRandomChars,
                      const std::string &theName) {
  const std::string aPrefix = theFinalBase + theTag;
  if (theFinalBase.empty() || theName.compare(0, aPrefix.size(), aPrefix) != 0)
    return 0;
  size_t aPos = aPrefix.size();
  long long aPid = 0;
  for (; aPos < theName.size() && std::isdigit(static_cast<unsigned char>(theName[aPos])); ++aPos) {
    aPid = aPid * 10 + (theName[aPos] - '0');
    if (aPid > INT32_MAX)
      return 0;
  }
  if (aPid == 0)
    return 0;
  if (theRandomChars == 0)
    return aPos == theName.size() ? static_cast<int>(aPid) : 0;
  // Then "." and the characters mkstemp chose, nothing else.
  const size_t aRandom = aPos + 1;
  if (aPos >= theName.size() || theName[aPos] != '.' || theName.size() != aRandom + theRandomChars)
    return 0;
  for (size_t i = aRandom; i < theName.size(); ++i)
    if (!std::isalnum(static_cast<unsigned char>(theName[i])))
      return 0;
  return static_cast<int>(aPid);
}

void fdfRemoveStaleTemporaries(const std::string &theFinalName, const char *theTag, int theRandomChars) {
  std::string aDir, aName, aExt;
  fdfSplitPath(theFinalName, aDir, aName, aExt);
  std::error_code aError;
  std::filesystem::directory_iterator aEntry(aDir.empty() ? "." : aDir, aError), aEnd;
  for (; !aError && aEntry != aEnd; aEntry.increment(aError)) {
    const int aOwner = fdfTemporaryOwner(aName + aExt, theTag, theRandomChars, aEntry->path().filename().string());
    if (aOwner == 0 || aOwner == fdfProcessId() || fdfProcessExists(aOwner))
      continue;
    std::error_code aStatusError;
    if (!aEntry->is_symlink(aStatusError) && aEntry->is_regular_file(aStatusError) &&
        fdfRemoveFileEntry(aEntry->path().c_str()) == 0)
      fdfTraceMessage("Removed the temporary of an ended run %s\n", aEntry->path().c_str());
  }
}

std::string fdfIntToText(long theValue) {
  char aText[32];
  if (theValue <= 32000)
    std::snprintf(aText, sizeof aText, "%ld", theValue);
  else
    std::snprintf(aText, sizeof aText, "%ld%04ld", theValue / 10000, theValue % 10000);
  return aText;
}

bool fdfIsSwitchOn(const std::string &theText) { return theText == "OK"; }

namespace {

bool fdfIsNumberBlank(char theChar) { return theChar == ' ' || theChar == '\t' || theChar == '\r' || theChar == '\n'; }

const char *fdfSkipNumberBlanks(const char *theText) {
  while (fdfIsNumberBlank(*theText))
    ++theText;
  return theText;
}

// The conversion stopped at theEnd: it read something and only blanks follow.
bool fdfReadToTheEnd(const char *theStart, const char *theEnd) {
  return theEnd != theStart && *fdfSkipNumberBlanks(theEnd) == '\0';
}

} // namespace

bool fdfParseWholeInteger(const char *theText, int32_t &theValue) {
  if (theText == nullptr)
    return false;
  const char *aStart = fdfSkipNumberBlanks(theText);
  // strtoll would skip other white space and accept nothing at all.
  if (!std::isdigit(static_cast<unsigned char>(*aStart)) && *aStart != '+' && *aStart != '-')
    return false;
  char *aEnd = nullptr;
  const int aSavedError = errno;
  errno = 0;
  const long long aValue = std::strtoll(aStart, &aEnd, 10);
  const bool aRange = errno != ERANGE && aValue >= INT32_MIN && aValue <= INT32_MAX;
  errno = aSavedError;
  if (!aRange || !fdfReadToTheEnd(aStart, aEnd))
    return false;
  theValue = static_cast<int32_t>(aValue);
  return true;
}

bool fdfParseWholeDouble(const char *theText, double &theValue, bool theFinite) {
  if (theText == nullptr)
    return false;
  const char *aStart = fdfSkipNumberBlanks(theText);
  if (*aStart == '\0' || std::isspace(static_cast<unsigned char>(*aStart)))
    return false;
  char *aEnd = nullptr;
  const int aSavedError = errno;
  errno = 0;
  const double aValue = std::strtod(aStart, &aEnd);
  // ERANGE also flags an underflow to a tiny value, which is kept.
  const bool aOverflow = errno == ERANGE && std::isinf(aValue);
  errno = aSavedError;
  if (aOverflow || !fdfReadToTheEnd(aStart, aEnd) || (theFinite && !std::isfinite(aValue)))
    return false;
  theValue = aValue;
  return true;
}

bool fdfIsRegularFile(const char *theName) {
  struct stat aStat;
  return theName != nullptr && stat(theName, &aStat) == 0 && S_ISREG(aStat.st_mode);
}
