// The only unit that talks to the operating system: process, clock, pauses,
// memory status, standard-stream redirection, path handling.
#pragma once

#include <cstdint>
#include <string>

constexpr long CTLRX_CLOCKS_PER_SEC = 1000;

// Wall-clock milliseconds since the process started.
long long fdfProcessClock();

// Pause between retries; replaceable so tests run retry paths without waiting.
using TLRXSleepFunction = void (*)(double theSeconds);
void fdfSleep(double theSeconds);
TLRXSleepFunction fdfSetSleepFunction(TLRXSleepFunction theFunction);

// POSIX keeps 8 bits of an exit status: 0 on success, else 1 + PEC (at most 125).
int fdfExitStatus(int32_t theCode);
[[noreturn]] void fdfExitProcess(int32_t theCode);

// Starts theExe with (theArg0, theArg1) detached, without waiting; 0 or errno.
int fdfSpawnDetached(const char *theExe, const char *theArg0, const char *theArg1);

// Directory of the running executable, with a trailing "/".
std::string fdfExecutableDir();

struct STLRXMemoryStatus {
  unsigned long long mLoadPercent = 0;
  unsigned long long mTotalPhys = 0;
  unsigned long long mAvailPhys = 0;
  unsigned long long mTotalPageFile = 0;
  unsigned long long mAvailPageFile = 0;
  unsigned long long mTotalVirtual = 0;
  unsigned long long mAvailVirtual = 0;
};
STLRXMemoryStatus fdfReadMemoryStatus();

// Keep descriptors 0 to 2 occupied so no file opened later lands on them.
void fdfReserveStdDescriptors();
// dup2 the standard streams onto thePrefix + "_cerr.txt", "_cout.txt",
// "_clog.txt" (line buffered); restored by fdfRestoreStdStreams.
bool fdfRedirectStdStreams(const std::string &thePrefix);
void fdfRestoreStdStreams();

// Splits at the last "/" or "\": directory (with its separator) and the rest.
void fdfSplitPath(const std::string &thePath, std::string &theDir, std::string &theName, std::string &theExt);
constexpr char CTLRX_PATH_SEPARATOR = '/';

// Whether both names exist and are one file (same device and inode), however
// they are spelled: links, relative parts and hard links resolved.
bool fdfSameFile(const std::string &theFirst, const std::string &theSecond);
int fdfProcessId();

// Tells the kernel theDescriptor will be read from start to end, so it reads
// ahead further; a hint only, failures are ignored.
void fdfAdviseSequentialRead(int theDescriptor);

// CPUs this process may run on: its affinity mask, capped by the CPU quota of
// its control group (cgroup v2 "cpu.max" or v1 "cpu.cfs_quota_us", rounded
// up); at least 1.
int fdfUsableCpuCount();

// SIGTERM and SIGINT only record that the operator asked to stop; the next
// progress check raises the interruption. Installing clears a request.
void fdfInstallInterruptionHandlers();
// "SIGTERM" or "SIGINT" once one arrived, else nullptr.
const char *fdfPendingInterruption();

// Whether a process of that id is alive (or exists under another user).
bool fdfProcessExists(int thePid);

// Removes a file or a link itself, never a directory (EISDIR), and never
// changes a mode: on Linux a file's own mode does not prevent its removal.
// 0 or the errno of the failure.
int fdfRemoveFileEntry(const char *theName);
// Whether theName is a directory (or a link to one).
bool fdfIsDirectory(const std::string &theName);
