// Small services shared by the runtime and the commands: files, copies,
// raster deletion with companions, memory, deferred deletion, text forms.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

constexpr int CTLRX_MAX_LEN_LIST_LINE = 10000;

// False for a missing or empty name and for the token "NotOK" (no file).
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

// Lines of a text file up to the first "#" line; raises 261122 when the file
// is found neither under its name nor in the working directory.
std::vector<std::string> fdfReadLineList(const char *theFileName, bool theTrim);
// Lines after the first of an argument file (cut at "###Tellurix###").
std::vector<std::string> fdfReadArgumentFile(const char *theArgument);

std::string fdfIntToText(long theValue);

// Temporaries of a run are named theFinalBase + theTag + the writer's pid,
// followed by "." and theRandomChars letters or digits when theRandomChars
// is not 0. The pid when theName (no folder) is such a temporary, else 0.
int fdfTemporaryOwner(const std::string &theFinalBase, const char *theTag, int theRandomChars,
                      const std::string &theName);
// A run that was killed leaves its temporaries behind; the next run writing
// theFinalName removes those of ended processes (regular files only).
void fdfRemoveStaleTemporaries(const std::string &theFinalName, const char *theTag, int theRandomChars);

// Numbers of headers, argument and parameter files are read whole: the
// entire text, blanks around it allowed, is the number, so "30 junk",
// "16e1" or "7.9" are no integer and "4294967303" does not wrap. False for
// anything else; a real that overflows is refused, and so is one that is
// not finite when theFinite (sizes, spacings, windows).
bool fdfParseWholeInteger(const char *theText, int32_t &theValue);
bool fdfParseWholeDouble(const char *theText, double &theValue, bool theFinite);

// A regular file, or a link to one. Readers ask before they open, so a FIFO,
// a device or a folder is refused instead of blocking or reading forever.
bool fdfIsRegularFile(const char *theName);

// Names of a list file: its trimmed lines up to the first "#" line, blank
// lines skipped (a trailing empty line names no file).
std::vector<std::string> fdfReadNameList(const char *theFileName);

bool fdfIsSwitchOn(const std::string &theText); // exactly "OK"
