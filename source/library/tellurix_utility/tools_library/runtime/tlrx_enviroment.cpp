// Runtime environment: start-up configuration, settings table, log and
// trace, banners, progress protocol with the host and the closing step.
#include "tlrx_enviroment.h"

#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"
#include "tlrx_platform.h"
#include "tlrx_time_man_utility.h"

#include <cerrno>
#include <cmath>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <fcntl.h>
#include <limits>
#include <memory>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>
#include <vector>

namespace {

using CEnvironmentTable = std::vector<std::pair<std::string, std::string>>;

std::unique_ptr<CEnvironmentTable> sEnvironment;
std::vector<std::string> sDeferredDeletions;
char sProcessName[CTLRX_MAX_LEN_PROCESS_NAME + 1] = " -";
std::string sBanner;
std::string sWorkingFilePath;
// The working file existed at some time in this run (the host's, or the one
// start-up created); only then are its absences waited out.
bool sWorkingFileSeen = false;
float sDummyValue = 0.0f;
double sDummyValueDouble = 0.0;
bool sTracing = false;
FILE *sTrace = nullptr;
FILE *sLog = nullptr;

// Settings read from the configuration file, in line order; line 13 is
// reserved and has no name.
const char *const sConfigurationNames[CTLRX_CONFIGURATION_LINES] = {
    "TELLURIX_KEY_FILES_DIR",        "TELLURIX_MANDATORY_DIR",
    "TELLURIX_WORKING_DIR",          "TELLURIX_EXE_DIR",
    "TELLURIX_MAP_FILES_DIR",        "TELLURIX_CEOS_DES_FILES_DIR",
    "TELLURIX_GCP_DATABASE_DIR",     "TELLURIX_ARESYS_DES_FILES_DIR",
    "TELLURIX_OTHER_01_DES_FILES_DIR", "TELLURIX_XML_SCHEMA_DES_FILES_DIR",
    "TELLURIX_DEFAULT_BYTE_ORDER",   "TELLURIX_TRACING",
    nullptr,                         "TELLURIX_DUMMY_VALUE"};

const std::string sStars(160, '*');

std::string fdfWithSeparator(const char *theDir) {
  std::string aDir(theDir);
  if (aDir.empty() || (aDir.back() != '/' && aDir.back() != '\\'))
    aDir += CTLRX_PATH_SEPARATOR;
  return aDir;
}

// Working file of the batch folder theBatchDir ("" when none is known).
std::string fdfWorkingFileIn(const std::string &theBatchDir) {
  if (theBatchDir.empty())
    return std::string();
  const char *aName = std::getenv("TELLURIX_WORKING_FILE");
  return theBatchDir + (aName != nullptr ? aName : "Process.working");
}

// Before the configuration is read, only the process environment can say
// where the host looks for the status files.
std::string fdfWorkingFileFromEnvironment() {
  for (const char *aVariable : {"TELLURIX_BATCH_DIR", "TELLURIX_WORKING_DIR"})
    if (const char *aDir = std::getenv(aVariable))
      if (aDir[0] != '\0')
        return fdfWorkingFileIn(fdfWithSeparator(aDir));
  return std::string();
}

// Taken also by a dangling link, which a copy would write through.
bool fdfNameTaken(const std::string &theName) {
  struct stat aStat;
  return lstat(theName.c_str(), &aStat) == 0;
}

bool fdfVWrite(FILE *theStream, const char *theFormat, va_list theArgs) {
  if (theStream == nullptr)
    return false;
  char aBuffer[CTLRX_MAX_LEN_CONTEXT];
  std::vsnprintf(aBuffer, sizeof aBuffer, theFormat, theArgs);
  std::fputs(aBuffer, theStream);
  std::fflush(theStream);
  return std::ferror(theStream) == 0;
}

bool fdfIsSeparator(char theChar) { return theChar == '\\' || theChar == '/'; }

// One configuration line: at most 511 characters, a stray character after a
// final separator dropped, the line end (and a carriage return) dropped.
bool fdfReadConfigurationLine(FILE *theFile, std::string &theLine) {
  theLine.clear();
  int aChar;
  bool aAny = false;
  while ((aChar = std::fgetc(theFile)) != EOF) {
    aAny = true;
    if (aChar == '\n')
      break;
    if (theLine.size() < CTLRX_MAX_LEN_CONFIGURATION_LINE)
      theLine += static_cast<char>(aChar);
  }
  if (!aAny)
    return false;
  if (!theLine.empty() && theLine.back() == '\r')
    theLine.pop_back();
  const size_t aLen = theLine.size();
  if (aLen >= 2 && !fdfIsSeparator(theLine[aLen - 1]) && fdfIsSeparator(theLine[aLen - 2]))
    theLine.pop_back();
  return true;
}

std::string fdfConfigurationDir() {
  if (const char *aDir = std::getenv("TELLURIX_INIT_DIR"))
    return fdfWithSeparator(aDir);
  if (const char *aDir = std::getenv("windir"))
    return fdfWithSeparator(aDir);
  const std::string aInstalled = fdfExecutableDir() + "../etc/tellurix/";
  if (fdfExistFile((aInstalled + "Tellurix_configuration.ini").c_str()))
    return aInstalled;
  TLRX_RAISE(CTLRX_ERR_SETTING_MISSING, "windir");
}

void fdfReadConfiguration(const std::string &theWorkingDirOverride) {
  const std::string aPath = fdfConfigurationDir() + "Tellurix_configuration.ini";
  std::unique_ptr<FILE, int (*)(FILE *)> aFile(std::fopen(aPath.c_str(), "r"), std::fclose);
  if (!aFile)
    TLRX_RAISE(CTLRX_ERR_FILE_OPEN, aPath.c_str());
  std::string aLine;
  for (int i = 0; i < CTLRX_CONFIGURATION_LINES; ++i) {
    if (!fdfReadConfigurationLine(aFile.get(), aLine))
      TLRX_RAISE(CTLRX_ERR_SETTING_MISSING, sConfigurationNames[i] != nullptr ? sConfigurationNames[i]
                                                                                : "reserved configuration line 13");
    if (sConfigurationNames[i] != nullptr)
      fdfSetEnvVar(aLine.c_str(), sConfigurationNames[i]);
  }
  if (!theWorkingDirOverride.empty())
    fdfSetEnvVar(theWorkingDirOverride.c_str(), "TELLURIX_WORKING_DIR");
}

void fdfExitHandler() {
  try {
    for (const std::string &aName : sDeferredDeletions)
      NTLRX_UTILITY_SpawnDeleteFile(aName.c_str());
    sDeferredDeletions.clear();
  } catch (...) {
    // Exiting already: report without calling exit again.
    fdfWriteErrorFile(CTLRX_ERR_UNEXPECTED_EXIT, "main_delete_file", static_cast<const char *>(nullptr));
    _exit(fdfExitStatus(CTLRX_ERR_UNEXPECTED_EXIT));
  }
}

void fdfStarsLine(bool theToLog, bool theToTrace, const char *theFormat, ...) __attribute__((format(printf, 3, 4)));
void fdfStarsLine(bool theToLog, bool theToTrace, const char *theFormat, ...) {
  va_list aArgs;
  if (theToLog) {
    va_start(aArgs, theFormat);
    fdfVWrite(sLog, theFormat, aArgs);
    va_end(aArgs);
  }
  if (theToTrace && sTracing) {
    va_start(aArgs, theFormat);
    fdfVWrite(sTrace, theFormat, aArgs);
    va_end(aArgs);
  }
}

// The banner blocks go to the log and then, the same, to the trace.
void fdfWriteStartBanner(FILE *theStream, const char *const *theArgv, int theArgc, const char *theParamText) {
  if (theStream == nullptr)
    return;
  std::fprintf(theStream, "\n\n\n%s\nSTART : %s  [ %s ]\n%s%s\n\n", sStars.c_str(), fdfGetProcessName(),
               sBanner.c_str(), fdfGetAscTime().c_str(), sStars.c_str());
  if (theParamText != nullptr)
    std::fputs(theParamText, theStream);
  else
    for (int i = 0; i < theArgc; ++i)
      std::fprintf(theStream, " Parameter %d (%s)\n", i, theArgv[i] != nullptr ? theArgv[i] : "");
  std::fprintf(theStream, "\n%s\n\n", sStars.c_str());
  std::fflush(theStream);
}

} // namespace

bool fdfGetEnvVar(std::string &theValue, const char *theName) {
  if (!sEnvironment)
    return false;
  for (const auto &aEntry : *sEnvironment)
    if (aEntry.first == theName) {
      theValue = aEntry.second;
      return true;
    }
  return false;
}

std::string fdfGetRequiredEnvVar(const char *theName) {
  std::string aValue;
  if (!fdfGetEnvVar(aValue, theName))
    TLRX_RAISE(CTLRX_ERR_SETTING_MISSING, theName);
  return aValue;
}

void fdfSetEnvVar(const char *theValue, const char *theName) {
  if (!sEnvironment) {
    sEnvironment = std::make_unique<CEnvironmentTable>();
    sEnvironment->reserve(50);
  }
  for (auto &aEntry : *sEnvironment)
    if (aEntry.first == theName) {
      aEntry.second = theValue;
      return;
    }
  sEnvironment->emplace_back(theName, theValue);
}

bool fdfEnvironmentExists() { return sEnvironment != nullptr; }
void fdfDeleteEnvironment() { sEnvironment.reset(); }

void fdfSetProcessName(const char *theName) {
  std::snprintf(sProcessName, sizeof sProcessName, " %s", theName != nullptr ? theName : "");
  for (char *aChar = sProcessName; *aChar != '\0'; ++aChar)
    if (*aChar == '\n' || *aChar == '\r')
      *aChar = ' ';
}

const char *fdfGetProcessName() { return sProcessName; }
void fdfSetBanner(const char *theText) { sBanner = theText != nullptr ? theText : ""; }
const char *fdfGetBanner() { return sBanner.c_str(); }
float fdfGetDummyValue() { return sDummyValue; }
double fdfGetDummyValueDouble() { return sDummyValueDouble; }

void fdfSetDummyValue(const char *theSetting) {
  if (std::strncmp(theSetting, "NaN", 3) == 0) {
    sDummyValue = std::numeric_limits<float>::quiet_NaN();
    sDummyValueDouble = std::numeric_limits<double>::quiet_NaN();
    // All exponent and mantissa bits set, sign clear.
    const uint32_t aBits32 = 0x7fffffffu;
    const uint64_t aBits64 = 0x7fffffffffffffffull;
    std::memcpy(&sDummyValue, &aBits32, sizeof aBits32);
    std::memcpy(&sDummyValueDouble, &aBits64, sizeof aBits64);
    return;
  }
  sDummyValueDouble = std::atof(theSetting);
  sDummyValue = static_cast<float>(sDummyValueDouble);
}

const std::string &fdfGetWorkingFilePath() { return sWorkingFilePath; }
void fdfSetWorkingFilePath(const std::string &thePath) {
  sWorkingFilePath = thePath;
  sWorkingFileSeen = fdfNameTaken(thePath);
}

bool fdfWorkingFileSeen() { return sWorkingFileSeen; }

std::string fdfFreeDatedName(const std::string &theDir, const char *thePrefix, const std::string &theStamp,
                             const char *theSuffix) {
  std::string aName = theDir + thePrefix + theStamp + theSuffix;
  for (int aCount = 1; fdfNameTaken(aName); ++aCount)
    aName = theDir + thePrefix + theStamp + "_" + std::to_string(aCount) + theSuffix;
  return aName;
}

bool fdfLogMessage(const char *theFormat, ...) {
  va_list aArgs;
  va_start(aArgs, theFormat);
  const bool aOk = fdfVWrite(sLog, theFormat, aArgs);
  va_end(aArgs);
  return aOk;
}

bool fdfTraceMessage(const char *theFormat, ...) {
  if (!sTracing)
    return true;
  va_list aArgs;
  va_start(aArgs, theFormat);
  const bool aOk = fdfVWrite(sTrace, theFormat, aArgs);
  va_end(aArgs);
  return aOk;
}

bool fdfIsTracing() { return sTracing; }

bool fdfOpenTrace(bool theAppend) {
  std::string aTracing;
  if (!fdfGetEnvVar(aTracing, "TELLURIX_TRACING") || aTracing.compare(0, 6, "ACTIVE") != 0)
    return false;
  const std::string aPath = fdfGetRequiredEnvVar("TELLURIX_WORKING_DIR") + "Process.trace";
  if (sTrace != nullptr)
    std::fclose(sTrace);
  sTrace = std::fopen(aPath.c_str(), theAppend ? "a" : "w");
  if (sTrace == nullptr)
    return false;
  sTracing = true;
  std::fputs("OpenTrace 1  2\n", sTrace);
  std::fflush(sTrace);
  fdfRedirectStdStreams(aPath);
  return std::ferror(sTrace) == 0;
}

void fdfCloseTrace() {
  if (sTrace == nullptr)
    return;
  std::fclose(sTrace);
  sTrace = nullptr;
  sTracing = false;
  fdfRestoreStdStreams();
  std::string aDir;
  if (!fdfGetEnvVar(aDir, "TELLURIX_WORKING_DIR"))
    return;
  if (fdfExistFile((aDir + "Process.trace_save").c_str())) {
    fdfCopyFile((aDir + "Process.trace").c_str(), fdfFreeDatedName(aDir, "Process", fdfGetTimeStamp(), ".trace").c_str(),
                true);
    fdfSleep(1);
  }
}

bool fdfOpenTellurixLog() {
  std::string aDir;
  if (!fdfGetEnvVar(aDir, "TELLURIX_WORKING_DIR"))
    return false;
  const std::string aPath = aDir + "Process.log";
  fdfTraceMessage("\nfdfOpenTellurixLog(%s);\n\n", aPath.c_str());
  const int aFd = open(aPath.c_str(), O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0644);
  if (aFd < 0)
    return false;
  if (sLog != nullptr)
    std::fclose(sLog);
  sLog = fdopen(aFd, "a");
  return sLog != nullptr;
}

void fdfCloseTellurixLog() {
  if (sLog != nullptr)
    std::fclose(sLog);
  sLog = nullptr;
}

namespace {

// Nobody prepared the working file (a person at a terminal, a rerun after a
// success removed it), so nobody watches it: create it now instead of
// waiting for it at every progress update.
void fdfPrepareWorkingFile() {
  const int aFd = open(sWorkingFilePath.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0644);
  if (aFd < 0) {
    if (errno == EEXIST)
      sWorkingFileSeen = true;
    else
      fdfTraceMessage("fdfInitEnvironment - Not found the working file, cannot create : %s\n", sWorkingFilePath.c_str());
    return;
  }
  const char aStatus[] = "0\n\n";
  const bool aWritten = write(aFd, aStatus, sizeof aStatus - 1) == static_cast<ssize_t>(sizeof aStatus - 1);
  close(aFd);
  sWorkingFileSeen = aWritten;
  fdfTraceMessage("fdfInitEnvironment - Not found the working file, created : %s\n", sWorkingFilePath.c_str());
}

} // namespace

bool fdfInitEnvironment(bool theFullSet, const char *theBanner) {
  sTracing = false;
  if (theFullSet)
    fdfInstallInterruptionHandlers();
  fdfReserveStdDescriptors();
  fdfSetBanner(theBanner);
  fdfInstallAllocationFailureHandler();
  std::srand(static_cast<unsigned>(std::time(nullptr)));
  fdfSetProcessName("-");
  fdfErrorCatalogue().clear();
  fdfWarningCatalogue().clear();
  static bool sExitHandlerRegistered = false;
  if (!sExitHandlerRegistered)
    sExitHandlerRegistered = std::atexit(fdfExitHandler) == 0;
  sEnvironment = std::make_unique<CEnvironmentTable>();
  sEnvironment->reserve(50);
  sDeferredDeletions.clear();
  sDeferredDeletions.reserve(110);
  // Provisional until the configuration is read: a failing start-up then
  // reports beside the host's working file, not in the current folder.
  sWorkingFilePath = fdfWorkingFileFromEnvironment();
  sWorkingFileSeen = false;

  std::string aWorkingDir;
  if (const char *aEnv = std::getenv("TELLURIX_WORKING_DIR"))
    aWorkingDir = fdfWithSeparator(aEnv);
  fdfReadConfiguration(aWorkingDir);

  if (const char *aBatch = std::getenv("TELLURIX_BATCH_DIR")) {
    std::fprintf(stderr, "TELLURIX_BATCH_DIR Found =%s\n", aBatch);
    fdfSetEnvVar(fdfWithSeparator(aBatch).c_str(), "TELLURIX_BATCH_DIR");
  } else {
    fdfSetEnvVar(fdfGetRequiredEnvVar("TELLURIX_WORKING_DIR").c_str(), "TELLURIX_BATCH_DIR");
  }
  sWorkingFilePath = fdfWorkingFileIn(fdfGetRequiredEnvVar("TELLURIX_BATCH_DIR"));
  fdfSetDummyValue(fdfGetRequiredEnvVar("TELLURIX_DUMMY_VALUE").c_str());
  if (const char *aGcp = std::getenv("TELLURIX_GCP_DATABASE_DIR"))
    fdfSetEnvVar(fdfWithSeparator(aGcp).c_str(), "TELLURIX_GCP_DATABASE_DIR");

  if (!theFullSet)
    return true;
  const std::string aDesDir = fdfGetRequiredEnvVar("TELLURIX_CEOS_DES_FILES_DIR");
  for (auto aEntry : {std::make_pair(&fdfErrorCatalogue(), "tlrx_errors_catalog.des"),
                      std::make_pair(&fdfWarningCatalogue(), "tlrx_warnings_catalog.des")}) {
    const std::string aPath = aDesDir + aEntry.second;
    if (!aEntry.first->load(aPath.c_str()))
      TLRX_RAISE(CTLRX_ERR_FILE_PARSE, aPath.c_str());
  }
  fdfResetWarningCount();
  fdfOpenTrace(false);
  // Without its log the host would not see how the run ended.
  if (!fdfOpenTellurixLog())
    TLRX_RAISE(CTLRX_ERR_FILE_OPEN, (fdfGetRequiredEnvVar("TELLURIX_WORKING_DIR") + "Process.log").c_str());
  fdfPrepareWorkingFile();
  return true;
}

void fdfStartProcess(const char *const *theArgv, int theArgc, const char *theName, const char *theParamText) {
  fdfSetProcessName(theName);
  fdfWriteStartBanner(sLog, theArgv, theArgc, theParamText);
  if (sTracing)
    fdfWriteStartBanner(sTrace, theArgv, theArgc, theParamText);
}

void fdfEndBanner() {
  fdfStarsLine(true, true, "\n%s\nEND : %s  -  %s\n%s\n\n", sStars.c_str(), sBanner.c_str(), fdfGetAscTime().c_str(),
               sStars.c_str());
}

namespace {

void fdfTraceStreamState(int theAttempt, const std::string &thePath, FILE *theFile) {
  std::string aState = " RDSTATE = ";
  if (theFile != nullptr && std::feof(theFile))
    aState += "End of file reached";
  if (theFile == nullptr || std::ferror(theFile))
    aState += "| A possibly recoverable formatting or conversion error";
  fdfTraceMessage("%d File %s attempt open : %s\n", theAttempt, thePath.c_str(), aState.c_str());
}

// Retries with growing pauses are for a working file that existed and is
// away for a moment; one that never existed is not waited for.
int fdfWorkingFileAttempts(int theAttempts) { return sWorkingFileSeen ? theAttempts : 1; }

// Creates a missing working file with the new percentage and text.
void fdfCreateWorkingFile(const std::string &thePath, int theNew, const char *theText) {
  fdfTraceMessage("getAndSetPerc - Not found the file : %s\n", thePath.c_str());
  const int aAttempts = fdfWorkingFileAttempts(10);
  for (int aAttempt = 0; aAttempt < aAttempts; ++aAttempt) {
    FILE *aFile = std::fopen(thePath.c_str(), "w");
    if (aFile != nullptr) {
      std::fprintf(aFile, "%i\n%s\n", theNew, theText != nullptr ? theText : "");
      std::fclose(aFile);
      sWorkingFileSeen = true;
      return;
    }
    fdfTraceMessage("%d getAndSetPerc - Not found the file : %s  attempt create : \n", aAttempt, thePath.c_str());
    if (aAttempts > 1)
      fdfSleep(aAttempt);
  }
  fdfTraceMessage(" File ERROR %s not found\n", thePath.c_str());
  TLRX_RAISE(CTLRX_ERR_INTERRUPTED, thePath.c_str());
}

FILE *fdfOpenWorkingFile(const std::string &thePath) {
  for (int aAttempt = 0; aAttempt < 5; ++aAttempt) {
    FILE *aFile = std::fopen(thePath.c_str(), "r+");
    if (aFile != nullptr)
      return aFile;
    fdfSleep(aAttempt);
    fdfTraceStreamState(aAttempt, thePath, nullptr);
  }
  return nullptr;
}

bool fdfWaitForWorkingFile(const std::string &thePath) {
  const int aChecks = fdfWorkingFileAttempts(10);
  for (int aCheck = 0; aCheck < aChecks; ++aCheck) {
    if (fdfExistFile(thePath.c_str())) {
      sWorkingFileSeen = true;
      return true;
    }
    fdfTraceMessage("%d] getAndSetPerc - Not found the file : %s\n", aCheck, thePath.c_str());
    if (aChecks > 1)
      fdfSleep(aCheck);
  }
  return false;
}

} // namespace

void fdfCheckInterruption() {
  const char *aSignal = fdfPendingInterruption();
  if (aSignal == nullptr)
    return;
  fdfTraceMessage("\n EXECUTION INTERRUPTED BY OPERATOR\n");
  TLRX_RAISE_F(CTLRX_ERR_INTERRUPTED, "Interrupted by %s", aSignal);
}

void getAndSetPerc(int thePrevious, int theNew, const char *theText) {
  // A signal costs one test of a flag, so every call checks it.
  fdfCheckInterruption();
  if (theNew == thePrevious || theNew >= 100)
    return;
  const std::string &aPath = sWorkingFilePath;
  fdfRemoveFile((aPath + "_batch_ok").c_str());
  if (!fdfWaitForWorkingFile(aPath)) {
    fdfCreateWorkingFile(aPath, theNew, theText);
    return;
  }
  FILE *aFile = fdfOpenWorkingFile(aPath);
  if (aFile == nullptr)
    return;
  char aLine1[CTLRX_MAX_LEN_WORKING_LINE + 1] = "";
  char aLine2[CTLRX_MAX_LEN_WORKING_LINE + 1] = "";
  if (std::fgets(aLine1, sizeof aLine1, aFile) != nullptr && std::fgets(aLine2, sizeof aLine2, aFile) != nullptr)
    aLine2[std::strcspn(aLine2, "\r\n")] = '\0';
  int aHostValue = 0;
  if (std::sscanf(aLine1, "%i", &aHostValue) == 1 && aHostValue > 100) {
    std::fclose(aFile);
    fdfTraceMessage("\n EXECUTION INTERRUPTED BY OPERATOR\n");
    TLRX_RAISE(CTLRX_ERR_INTERRUPTED, nullptr);
  }
  std::rewind(aFile);
  const int aLen = std::fprintf(aFile, "%i\n%s\n", theNew, theText != nullptr ? theText : aLine2);
  std::fflush(aFile);
  // A shorter status must not leave the tail of the previous one behind.
  if (aLen > 0 && ftruncate(fileno(aFile), aLen) != 0)
    fdfTraceMessage("getAndSetPerc - cannot truncate %s\n", aPath.c_str());
  std::fclose(aFile);
}

int32_t fdfEndProcess(int32_t theCode, bool theFinalText, bool theSuccessText) {
  std::string aDir;
  fdfGetEnvVar(aDir, "TELLURIX_WORKING_DIR");
  if (theFinalText) {
    if (theCode != 0)
      fdfLogMessage("\n\n-%s   %s\n\n%s\n\nERROR :\n  %s\n\n", fdfGetProcessName(), sBanner.c_str(),
                    fdfGetAscTime().c_str(), " ");
    else if (theSuccessText)
      fdfLogMessage("\n\nSUCCESSFUL\n\n%s\n\n", fdfGetAscTime().c_str());
    fdfEndBanner();
    fdfCloseTellurixLog();
    fdfCloseTrace();
  }
  const std::string aTrace = aDir + "Process.trace";
  if (theCode != 0 && !aDir.empty() && fdfExistFile(aTrace.c_str()))
    fdfCopyFile(aTrace.c_str(), fdfFreeDatedName(aDir, "Process_", fdfGetTimeStamp(), "_trace.txt").c_str(), true);
  if (theCode == 0 && fdfExistFile(sWorkingFilePath.c_str())) {
    if (fdfGetWarningCount() > 0) {
      fdfWriteErrorFile(CTLRX_WARNING_STATUS, "", static_cast<const char *>(nullptr));
    } else {
      fdfRemoveFile(sWorkingFilePath.c_str());
      for (int aAttempt = 0; aAttempt < 30 && fdfExistFile(sWorkingFilePath.c_str()); ++aAttempt) {
        fdfSleep(static_cast<int>(aAttempt * 0.1));
        fdfRemoveFile(sWorkingFilePath.c_str());
      }
      if (fdfExistFile(sWorkingFilePath.c_str()))
        TLRX_RAISE(CTLRX_ERR_WORKING_FILE_REMOVE, sWorkingFilePath.c_str());
    }
  }
  const std::string aLog = aDir + "Process.log";
  if (!aDir.empty() && fdfExistFile(aLog.c_str()) && fdfGetFileSize(aLog.c_str()) > CTLRX_MAX_LOG_SIZE) {
    // Renamed, not copied and removed: a failed copy would lose the history.
    const std::string aAside = fdfFreeDatedName(aDir, "Process_", fdfGetTimeStamp(), "_log.txt");
    if (std::rename(aLog.c_str(), aAside.c_str()) != 0)
      fdfTraceMessage("fdfEndProcess - cannot move %s aside : %s\n", aLog.c_str(), std::strerror(errno));
  }
  // A run that failed after warnings ends as the failure it is.
  if (theCode != 0)
    return theCode;
  return fdfGetWarningCount() > 0 ? CTLRX_WARNING_STATUS : 0;
}

void fdfAddDeferredDeletion(const char *theFileName) { sDeferredDeletions.emplace_back(theFileName); }
