// Numbered errors: code arithmetic, catalogues, the exception record and the
// raising protocol shared by every module.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "tlrx_error_codes.h"

constexpr int32_t CTLRX_PEC_SIZE = 65280;          // codes per primary class
constexpr int CTLRX_MAX_LEN_IN_ERROR = 48;         // characters per error-file line
constexpr int CTLRX_MAX_LINE_IN_ERROR = 3;         // message lines in the error file
constexpr int CTLRX_MAX_LEN_ERROR_TEXT = 1026;     // catalogue text buffers
constexpr int CTLRX_MAX_LEN_CATALOGUE_TEXT = 1025; // stored secondary texts are cut here
constexpr int CTLRX_MAX_LEN_MESSAGE = 1028;        // free message of the exception
constexpr int CTLRX_MAX_LEN_CONTEXT = 25000;       // formatting buffers and process context
constexpr int CTLRX_MAX_LEN_FILE = 260;

// code = PEC * 65280 + SEC + 1 (SEC -1 for none)
constexpr int32_t fdfErrorCode(int32_t thePEC, int32_t theSEC) { return thePEC * CTLRX_PEC_SIZE + theSEC + 1; }
constexpr int32_t fdfGetPEC(int32_t theCode) { return theCode / CTLRX_PEC_SIZE; }
constexpr int32_t fdfGetSEC(int32_t theCode) { return theCode % CTLRX_PEC_SIZE - 1; }

// Codes of the runtime services and the entry point.

// One catalogue of texts (errors or warnings), read from a catalogue file.
class CErrorCatalogue {
public:
  int32_t mPECNbr = 0;
  std::vector<std::string> mPrimaryTexts;
  std::vector<int32_t> mSECNbr;
  std::vector<std::vector<std::string>> mSecondaryTexts;

  // Reads the catalogue file; false (catalogue left empty) when it cannot be
  // read or is malformed.
  bool load(const char *thePath);
  void clear();
  bool empty() const { return mPECNbr == 0; }
};

CErrorCatalogue &fdfErrorCatalogue();
CErrorCatalogue &fdfWarningCatalogue();

// Looks up both texts of a code; out buffers hold CTLRX_MAX_LEN_ERROR_TEXT bytes.
void fdfLookupErrorTexts(const CErrorCatalogue &theCatalogue, int32_t theCode, char *thePrimary, char *theSecondary);
// Variants used for the error file, with their own fallback texts.
void fdfErrorFilePrimaryText(const CErrorCatalogue &theCatalogue, int32_t theCode, char *theOut);
void fdfErrorFileSecondaryText(const CErrorCatalogue &theCatalogue, int32_t theCode, char *theOut);

// The one error of the program: every raise throws it by value; the entry
// point reports it (fdfReportError), library callers and tests catch it.
class CErrorExceptionManager {
public:
  char mContext[CTLRX_MAX_LEN_CONTEXT];
  char mFile[CTLRX_MAX_LEN_FILE];
  int32_t mLine;
  int32_t mCode;
  int32_t mPrimaryCode;
  int32_t mSecondaryCode;
  char mPrimaryText[CTLRX_MAX_LEN_ERROR_TEXT];
  char mSecondaryText[CTLRX_MAX_LEN_ERROR_TEXT];
  char mMessage[CTLRX_MAX_LEN_MESSAGE];
  int mErrno = 0; // errno when it was raised, for the trace

  CErrorExceptionManager(int32_t theCode, int32_t theLine, const char *theFile, const char *theContext,
                         const char *theMessage);
};

// Raises an error: throws CErrorExceptionManager with the code, the message,
// the source file and line and the current process name. A raise while an
// error is being reported ends the process at once.
[[noreturn]] void fdfRaiseError(int32_t theCode, const char *theMessage, const char *theFile, int theLine);
// Reports an error that reached the entry point: the error file and the
// working-file status, the trace and log blocks, the closing step with its
// END banner. Returns the exit status of the run.
int fdfReportError(const CErrorExceptionManager &theError);
// The same with a printf-style message, formatted into a bounded buffer.
[[noreturn]] void fdfRaiseErrorF(int32_t theCode, const char *theFile, int theLine, const char *theFormat, ...)
    __attribute__((format(printf, 4, 5)));

// Long form: texts from the error catalogue. Short form: from the warning catalogue.
void fdfRaiseWarning(int32_t theCode, const char *theMessage, const char *theFile, int theLine);
void fdfRaiseShortWarning(int32_t theCode, const char *theMessage, const char *theFile, int theLine);
int32_t fdfGetWarningCount();
void fdfResetWarningCount();

// Writes the error file and the error status of the working file; the
// message list ends with nullptr. Reports whether the last file opened.
bool fdfWriteErrorFile(int32_t theCode, ...);

#define TLRX_RAISE(theCode, theMessage) fdfRaiseError((theCode), (theMessage), __FILE__, __LINE__)
#define TLRX_RAISE_F(theCode, ...) fdfRaiseErrorF((theCode), __FILE__, __LINE__, __VA_ARGS__)
#define TLRX_WARNING(theCode, theMessage) fdfRaiseWarning((theCode), (theMessage), __FILE__, __LINE__)
#define TLRX_SHORT_WARNING(theCode, theMessage) fdfRaiseShortWarning((theCode), (theMessage), __FILE__, __LINE__)
