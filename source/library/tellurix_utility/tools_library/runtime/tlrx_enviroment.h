// Runtime environment: settings table, process name, log, trace, START/END
// banners, progress protocol with the host and the closing step.
#pragma once

#include <cstdint>
#include <string>

constexpr int CTLRX_MAX_LEN_PROCESS_NAME = 80;
constexpr int CTLRX_MAX_LEN_WORKING_LINE = 1026;
constexpr long CTLRX_MAX_LOG_SIZE = 1000000;
constexpr int CTLRX_CONFIGURATION_LINES = 14;
constexpr int CTLRX_MAX_LEN_CONFIGURATION_LINE = 511;

// Start-up: settings, catalogues, trace and log. Failures raise; returns
// true.
bool fdfInitEnvironment(bool theFullSet, const char *theBanner);

// Settings table. Reading reports whether the name was found.
bool fdfGetEnvVar(std::string &theValue, const char *theName);
// Reads a required setting; raises 783360 with its name when missing.
std::string fdfGetRequiredEnvVar(const char *theName);
void fdfSetEnvVar(const char *theValue, const char *theName);
bool fdfEnvironmentExists();
void fdfDeleteEnvironment();

void fdfSetProcessName(const char *theName);
const char *fdfGetProcessName();
void fdfSetBanner(const char *theBanner);
const char *fdfGetBanner();

// Program-wide no-data value of results (TELLURIX_DUMMY_VALUE).
float fdfGetDummyValue();
double fdfGetDummyValueDouble();
void fdfSetDummyValue(const char *theSetting);

const std::string &fdfGetWorkingFilePath();
// The file counts as seen when it exists at that moment.
void fdfSetWorkingFilePath(const std::string &thePath);
// Whether the working file existed at some time in this run (found or
// created at start-up, or found later): only then are its absences retried
// with growing pauses.
bool fdfWorkingFileSeen();

// theDir + thePrefix + theStamp + theSuffix, or with "_1", "_2", ... after
// the stamp when that name is taken, so dated copies never overwrite.
std::string fdfFreeDatedName(const std::string &theDir, const char *thePrefix, const std::string &theStamp,
                             const char *theSuffix);

// Formatted into a 25000-character buffer; the trace variant does nothing
// while tracing is off. Both report whether the stream is still good.
bool fdfLogMessage(const char *theFormat, ...) __attribute__((format(printf, 1, 2)));
bool fdfTraceMessage(const char *theFormat, ...) __attribute__((format(printf, 1, 2)));
bool fdfIsTracing();

bool fdfOpenTrace(bool theAppend);
void fdfCloseTrace();
bool fdfOpenTellurixLog();
void fdfCloseTellurixLog();

// START banner of a processing step: argument list or parameter text.
void fdfStartProcess(const char *const *theArgv, int theArgc, const char *theName, const char *theParamText);
void fdfEndBanner();

// Raises 326400 when SIGTERM or SIGINT arrived since start-up.
void fdfCheckInterruption();
// Progress update in the working file; raises 326400 when the host asked
// for an interruption (a value above 100 in the first line) or a signal did.
void getAndSetPerc(int thePrevious, int theNew, const char *theText = nullptr);

// Closing step of every run: texts, END banner, trace copy, working file,
// log rotation. Returns the run's final code: theCode when it failed, else
// the warning status after warnings, else 0.
int32_t fdfEndProcess(int32_t theCode, bool theFinalText, bool theSuccessText);

// Files removed by a separate process when this one exits.
void fdfAddDeferredDeletion(const char *theFileName);
