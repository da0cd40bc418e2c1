// Helpers shared by the command drivers and step programs: input headers,
// acquisition times, result headers and the progress of a line loop.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "tlrx_description_section.h"
#include "tlrx_header_numbers.h"

// Key of the acquisition date in "RasterInfo.OtherInfo".
constexpr const char *CTLRX_ACQUISITION_TIME_KEY = "ACQUISITION TIME";

// Start of the drivers that take an argument file: its tokens (the lines
// after the first), echoed in the START banner of theTitle.
std::vector<std::string> fdfStartArgumentCommand(const char *theArguments, const char *theTitle);
// " argv[i] = token" for the first theCount tokens, to the trace.
void fdfTraceTokens(const std::vector<std::string> &theTokens, size_t theCount);

// Number tokens of the drivers and step programs, read whole (a window of
// "7abc" or "7.9" is not 7; a real must be finite). Anything else raises
// theCode with "theWhat: not an integer [token]" ("not a number" for reals).
int32_t fdfIntegerToken(const char *theToken, const char *theWhat, int32_t theCode);
double fdfRealToken(const char *theToken, const char *theWhat, int32_t theCode);

// Reads the standard header of raster theRaster (its name + "_hdr", the
// ".sml" form first). A missing header traces "Error: missing parameter
// file " and raises 261122 with the header name.
void fdfLoadInputHeader(const std::string &theRaster, CDescription &theHeader);

// Value of the first "RasterInfo.OtherInfo" row whose key begins with
// theKey; false when there is none.
bool fdfFindOtherInfo(const CDescription &theHeader, const char *theKey, std::string &theValue);

// Sets a scalar field (string, integer or double as the field is typed); a
// key the header does not declare raises 848642 naming it, a number that an
// integer field cannot hold raises 848644.
void fdfSetHeaderText(CDescription &theHeader, const char *theKey, const char *theValue);
void fdfSetHeaderNumber(CDescription &theHeader, const char *theKey, double theValue);
// Stores theNames in the string vector theKey.
void fdfSetHeaderList(CDescription &theHeader, const char *theKey, const std::vector<std::string> &theNames);

// A result header made from an input header: cells theCellType with no
// offset, prefix or suffix, null value theNull, and theUnits as "DataUnits"
// (nullptr keeps the input's). A footer or scale factors of the input do not
// describe the written result, so they are reset to none.
void fdfMakeResultHeader(CDescription &theResult, const CDescription &theInput, const char *theCellType,
                         const char *theUnits, double theNull);

// The result of a pair: "FilesList" of both names; the first input's
// acquisition time as "ACQUISITION TIME" and "MASTER ACQUISITION TIME", the
// second's as "SLAVE ACQUISITION TIME" (each only when the input has one).
void fdfStampPairHeaders(CDescription &theResult, const std::string &theFirstName, const CDescription &theFirst,
                         const std::string &theSecondName, const CDescription &theSecond);

// Writes a result header beside raster theRaster; on failure traces "Error
// while writing parameter file " and raises theCode with the header name.
void fdfWriteResultHeader(const std::string &theRaster, CDescription &theHeader, int32_t theCode);

// Sends the progress of line theLine of theLines (scaled to theScale) when
// its integer percentage changes; the host's interruption ends the run.
class CLineProgress {
public:
  explicit CLineProgress(double theScale, int theOffset = 0) : mScale(theScale), mOffset(theOffset) {}
  void update(int64_t theLine, int64_t theLines);

private:
  double mScale;
  int mOffset;
  int mLast = -1;
};
