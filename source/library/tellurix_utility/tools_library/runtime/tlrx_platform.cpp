// Linux stand-ins for the operating-system services of the program.
#include "tlrx_platform.h"

#include "tlrx_errors.h"

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <chrono>
#include <climits>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <fstream>
#include <sched.h>
#include <iostream>
#include <spawn.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

extern char **environ;

namespace {

const auto sStartTime = std::chrono::steady_clock::now();

void fdfRealSleep(double theSeconds) {
  if (theSeconds > 0)
    std::this_thread::sleep_for(std::chrono::duration<double>(theSeconds));
}

TLRXSleepFunction sSleepFunction = fdfRealSleep;

// Saved copies of descriptors 0 to 2 while they are redirected; -1 when not.
int sSavedStd[3] = {-1, -1, -1};
// The C++ log stream gets a file buffer of its own while redirected.
std::filebuf sClogFile;
std::streambuf *sSavedClog = nullptr;

} // namespace

long long fdfProcessClock() {
  return std::chrono::duration_cast<std::chrono::milliseconds>(std::chrono::steady_clock::now() - sStartTime)
      .count();
}

void fdfSleep(double theSeconds) { sSleepFunction(theSeconds); }

TLRXSleepFunction fdfSetSleepFunction(TLRXSleepFunction theFunction) {
  TLRXSleepFunction aOld = sSleepFunction;
  sSleepFunction = theFunction != nullptr ? theFunction : fdfRealSleep;
  return aOld;
}

int fdfExitStatus(int32_t theCode) {
  if (theCode == 0)
    return 0;
  const int32_t aPEC = theCode > 0 ? fdfGetPEC(theCode) : 0;
  return static_cast<int>(aPEC + 1 > 125 ? 125 : aPEC + 1);
}

void fdfExitProcess(int32_t theCode) {
  std::fflush(nullptr);
  std::exit(fdfExitStatus(theCode));
}

int fdfSpawnDetached(const char *theExe, const char *theArg0, const char *theArg1) {
  // Double fork: the middle child starts a new session, spawns the worker
  // and exits at once, so the worker is adopted by init and never a zombie.
  pid_t aMiddle = fork();
  if (aMiddle < 0)
    return errno;
  if (aMiddle == 0) {
    setsid();
    char *aArgv[] = {const_cast<char *>(theArg0), const_cast<char *>(theArg1), nullptr};
    pid_t aWorker;
    const int aError = posix_spawn(&aWorker, theExe, nullptr, nullptr, aArgv, environ);
    _exit(aError == 0 ? 0 : (aError & 0x7f));
  }
  int aStatus = 0;
  while (waitpid(aMiddle, &aStatus, 0) < 0 && errno == EINTR) {
  }
  if (WIFEXITED(aStatus))
    return WEXITSTATUS(aStatus);
  return ECHILD;
}

std::string fdfExecutableDir() {
  char aPath[PATH_MAX];
  const ssize_t aLen = readlink("/proc/self/exe", aPath, sizeof aPath - 1);
  if (aLen <= 0)
    return "./";
  aPath[aLen] = '\0';
  std::string aText(aPath);
  return aText.substr(0, aText.rfind('/') + 1);
}

namespace {

unsigned long long fdfMemInfoValue(const std::string &theText, const char *theKey) {
  const size_t aPos = theText.find(theKey);
  if (aPos == std::string::npos)
    return 0;
  return std::strtoull(theText.c_str() + aPos + std::strlen(theKey), nullptr, 10) * 1024ULL;
}

unsigned long long fdfCgroupLimit() {
  std::ifstream aIn("/sys/fs/cgroup/memory.max");
  std::string aValue;
  if (!(aIn >> aValue)) {
    std::ifstream aV1("/sys/fs/cgroup/memory/memory.limit_in_bytes");
    if (!(aV1 >> aValue))
      return 0;
  }
  if (aValue == "max")
    return 0;
  return std::strtoull(aValue.c_str(), nullptr, 10);
}

} // namespace

STLRXMemoryStatus fdfReadMemoryStatus() {
  STLRXMemoryStatus aStatus;
  std::ifstream aIn("/proc/meminfo");
  std::string aText((std::istreambuf_iterator<char>(aIn)), std::istreambuf_iterator<char>());
  aStatus.mTotalPhys = fdfMemInfoValue(aText, "MemTotal:");
  aStatus.mAvailPhys = fdfMemInfoValue(aText, "MemAvailable:");
  aStatus.mTotalPageFile = fdfMemInfoValue(aText, "SwapTotal:");
  aStatus.mAvailPageFile = fdfMemInfoValue(aText, "SwapFree:");
  const unsigned long long aLimit = fdfCgroupLimit();
  if (aLimit > 0 && aLimit < aStatus.mTotalPhys) {
    aStatus.mTotalPhys = aLimit;
    if (aStatus.mAvailPhys > aLimit)
      aStatus.mAvailPhys = aLimit;
  }
  aStatus.mTotalVirtual = aStatus.mTotalPhys + aStatus.mTotalPageFile;
  aStatus.mAvailVirtual = aStatus.mAvailPhys + aStatus.mAvailPageFile;
  if (aStatus.mTotalPhys > 0)
    aStatus.mLoadPercent = 100 - aStatus.mAvailPhys * 100 / aStatus.mTotalPhys;
  return aStatus;
}

void fdfReserveStdDescriptors() {
  for (int aFd = 0; aFd <= 2; ++aFd) {
    if (fcntl(aFd, F_GETFD) == -1 && errno == EBADF) {
      const int aNull = open("/dev/null", aFd == 0 ? O_RDONLY : O_WRONLY);
      if (aNull >= 0 && aNull != aFd) {
        dup2(aNull, aFd);
        close(aNull);
      }
    }
  }
}

bool fdfRedirectStdStreams(const std::string &thePrefix) {
  // stderr, stdout and the C++ log stream (which writes to stderr) each get
  // their own companion file.
  static const char *const aSuffixes[3] = {"_cerr.txt", "_cout.txt", "_clog.txt"};
  static const int aFds[2] = {2, 1};
  std::fflush(nullptr);
  bool aOk = true;
  for (int i = 0; i < 2; ++i) {
    const int aFile = open((thePrefix + aSuffixes[i]).c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
    if (aFile < 0) {
      aOk = false;
      continue;
    }
    const int aFd = aFds[i];
    if (sSavedStd[aFd] < 0)
      sSavedStd[aFd] = fcntl(aFd, F_DUPFD_CLOEXEC, 3);
    dup2(aFile, aFd);
    close(aFile);
  }
  std::clog.flush();
  if (sClogFile.is_open())
    sClogFile.close();
  if (sClogFile.open(thePrefix + aSuffixes[2], std::ios::out | std::ios::trunc) != nullptr) {
    if (sSavedClog == nullptr)
      sSavedClog = std::clog.rdbuf();
    std::clog.rdbuf(&sClogFile);
  } else {
    aOk = false;
  }
  setvbuf(stdout, nullptr, _IOLBF, 0);
  return aOk;
}

void fdfRestoreStdStreams() {
  std::clog.flush();
  if (sSavedClog != nullptr) {
    std::clog.rdbuf(sSavedClog);
    sSavedClog = nullptr;
  }
  if (sClogFile.is_open())
    sClogFile.close();
  std::fflush(nullptr);
  for (int aFd = 1; aFd <= 2; ++aFd) {
    if (sSavedStd[aFd] >= 0) {
      dup2(sSavedStd[aFd], aFd);
      close(sSavedStd[aFd]);
      sSavedStd[aFd] = -1;
    }
  }
}

void fdfSplitPath(const std::string &thePath, std::string &theDir, std::string &theName, std::string &theExt) {
  const size_t aSlash = thePath.find_last_of("/\\");
  theDir = aSlash == std::string::npos ? std::string() : thePath.substr(0, aSlash + 1);
  const std::string aRest = aSlash == std::string::npos ? thePath : thePath.substr(aSlash + 1);
  const size_t aDot = aRest.rfind('.');
  theName = aDot == std::string::npos ? aRest : aRest.substr(0, aDot);
  theExt = aDot == std::string::npos ? std::string() : aRest.substr(aDot);
}

bool fdfSameFile(const std::string &theFirst, const std::string &theSecond) {
  struct stat aFirst, aSecond;
  if (stat(theFirst.c_str(), &aFirst) != 0 || stat(theSecond.c_str(), &aSecond) != 0)
    return false;
  return aFirst.st_dev == aSecond.st_dev && aFirst.st_ino == aSecond.st_ino;
}

int fdfProcessId() { return static_cast<int>(getpid()); }

namespace {

// Quota over period of a control-group file, or 0 when unlimited or absent.
// cgroup v2 holds both in one file ("max 100000" when unlimited).
double fdfCgroupCpuLimit(const std::string &theQuotaFile, const std::string &thePeriodFile) {
  std::ifstream aQuota(theQuotaFile);
  std::string aQuotaText;
  double aPeriod = 0.0;
  if (!(aQuota >> aQuotaText) || aQuotaText == "max")
    return 0.0;
  if (thePeriodFile.empty())
    aQuota >> aPeriod;
  else
    std::ifstream(thePeriodFile) >> aPeriod;
  const double aValue = std::strtod(aQuotaText.c_str(), nullptr);
  return aValue > 0.0 && aPeriod > 0.0 ? aValue / aPeriod : 0.0;
}

// The process's own cgroup v2 folder ("0::/path" in /proc/self/cgroup).
std::string fdfOwnCgroupDir() {
  std::ifstream aList("/proc/self/cgroup");
  std::string aLine;
  while (std::getline(aList, aLine))
    if (aLine.compare(0, 3, "0::") == 0)
      return "/sys/fs/cgroup" + aLine.substr(3);
  return "/sys/fs/cgroup";
}

} // namespace

void fdfAdviseSequentialRead(int theDescriptor) {
  if (theDescriptor >= 0)
    posix_fadvise(theDescriptor, 0, 0, POSIX_FADV_SEQUENTIAL);
}

int fdfUsableCpuCount() {
  cpu_set_t aSet;
  CPU_ZERO(&aSet);
  int aCount = sched_getaffinity(0, sizeof(aSet), &aSet) == 0 ? CPU_COUNT(&aSet) : 0;
  if (aCount < 1)
    aCount = std::max(1L, sysconf(_SC_NPROCESSORS_ONLN));
  double aLimit = fdfCgroupCpuLimit(fdfOwnCgroupDir() + "/cpu.max", "");
  if (aLimit <= 0.0)
    aLimit = fdfCgroupCpuLimit("/sys/fs/cgroup/cpu.max", "");
  if (aLimit <= 0.0)
    aLimit = fdfCgroupCpuLimit("/sys/fs/cgroup/cpu/cpu.cfs_quota_us", "/sys/fs/cgroup/cpu/cpu.cfs_period_us");
  if (aLimit > 0.0)
    aCount = std::min(aCount, std::max(1, static_cast<int>(std::ceil(aLimit))));
  return aCount;
}

namespace {

volatile std::sig_atomic_t sInterruptionSignal = 0;

void fdfOnInterruption(int theSignal) { sInterruptionSignal = theSignal; }

} // namespace

void fdfInstallInterruptionHandlers() {
  sInterruptionSignal = 0;
  struct sigaction aAction {};
  aAction.sa_handler = fdfOnInterruption;
  sigemptyset(&aAction.sa_mask);
  // Interrupted reads and writes resume; the run stops at its next check.
  aAction.sa_flags = SA_RESTART;
  sigaction(SIGTERM, &aAction, nullptr);
  sigaction(SIGINT, &aAction, nullptr);
}

const char *fdfPendingInterruption() {
  switch (sInterruptionSignal) {
  case 0: return nullptr;
  case SIGINT: return "SIGINT";
  default: return "SIGTERM";
  }
}

bool fdfProcessExists(int thePid) {
  if (thePid <= 0)
    return true; // not one process: never taken for a dead one
  return kill(static_cast<pid_t>(thePid), 0) == 0 || errno == EPERM;
}

int fdfRemoveFileEntry(const char *theName) {
  if (theName == nullptr || theName[0] == '\0')
    return ENOENT;
  struct stat aStat;
  if (lstat(theName, &aStat) != 0)
    return errno;
  if (S_ISDIR(aStat.st_mode))
    return EISDIR;
  return unlink(theName) == 0 ? 0 : errno;
}

bool fdfIsDirectory(const std::string &theName) {
  struct stat aStatus;
  return stat(theName.c_str(), &aStatus) == 0 && S_ISDIR(aStatus.st_mode);
}
