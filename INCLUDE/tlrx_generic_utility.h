// Small services shared by the runtime and the commands: files, copies,
// raster deletion with companions, memory, deferred deletion, text forms.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

constexpr int CTLRX_MAX_LEN_LIST_LINE = 10000;

bool fdfExistFile(const char *theName);
long long fdfGetFileSize(const char *theName);
bool fdfRemoveFile(const char *theName);
// Removes the file (when asked) and then its companion files (when asked).
bool fdfDeleteRaster(const char *theName, bool theWithCompanions, bool theDeleteFile);
// Raises 261123 on failure. A missing "_hdr" source falls back to ".sml".
void fdfCopyFile(const char *theSource, const char *theDest, bool theKeepGoing);
// Total physical memory; traces the status when asked.
unsigned long long fdfGetMemoryStatus(bool theTrace);
// Installed at start-up: reports a failed allocation as 195840.
void fdfInstallAllocationFailureHandler();
void fdfAllocationFailure(unsigned long long theSize);

int NTLRX_UTILITY_SpawnDeleteFile(const char *theName);

// Temporary files of a command, removed (or only traced) in one go.
void fdfAddToDeletionList(const char *theName, bool theWithCompanions);
void fdfRunDeletionList(bool theExecute);

// Lines of a text file up to the first "#" line; raises 261122 when the file
// is found neither under its name nor in the working directory.
std::vector<std::string> fdfReadLineList(const char *theFileName, bool theTrim);
// Lines after the first of an argument file (cut at "###Tellurix###").
std::vector<std::string> fdfReadArgumentFile(const char *theArgument);

std::string fdfIntToText(long theValue);

// No-data rule shared by the commands: both NaN, or within FLT_MIN of D.
bool fdfIsNull(double theValue, double theNull);
bool fdfIsSwitchOn(const std::string &theText); // exactly "OK"
