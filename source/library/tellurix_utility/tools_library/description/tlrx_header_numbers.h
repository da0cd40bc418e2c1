// Typed reads of the numbers of a read header: every reader of header
// numbers goes through these, so a count, a spacing or a null value means the
// same whatever the field's declared type (integer, double, or a text read
// whole, "NaN" texts giving NaN for reals).
//
// A failure raises the reader's numbered error with "[file: ]key what", after
// dumping the field to the trace: "holds no value", "is not an integer
// [text]", "is not a number [text]", "is not a finite number [text]",
// "is not in 1 to max [text]".
#pragma once

#include <cstdint>
#include <string>

#include "tlrx_description_section.h"

// Who reads: the error it raises and the file its messages begin with.
struct SHeaderReader {
  int32_t mCode = CTLRX_ERR_DS_FIELD_MISSING;
  const char *mFile = nullptr; // none: the message begins with the key
};

// Whether theKey names a scalar field that holds a value.
bool fdfHeaderHolds(const CDescription &theHeader, const char *theKey);
// The text of string field theKey ("RasterInfo.CellType"), empty when it
// holds none or is not a string.
std::string fdfHeaderText(const CDescription &theHeader, const char *theKey);

// Non-raising forms: an empty text when theValue was read, otherwise what is
// wrong with the field ("holds no value", "is not an integer [7.5]").
std::string fdfReadHeaderInteger(const CDescription &theHeader, const char *theKey, int32_t &theValue);
std::string fdfReadHeaderReal(const CDescription &theHeader, const char *theKey, bool theFinite, double &theValue);

// Raises theReader's error for theKey with theProblem.
[[noreturn]] void fdfRaiseHeaderProblem(const CDescription &theHeader, const char *theKey,
                                        const std::string &theProblem, const SHeaderReader &theReader);

// Integers: whole texts and whole doubles in the 32-bit range.
int32_t fdfHeaderInteger(const CDescription &theHeader, const char *theKey, const SHeaderReader &theReader = {});
// theDefault only when the field holds no value; a bad value still raises.
int32_t fdfHeaderIntegerOr(const CDescription &theHeader, const char *theKey, int32_t theDefault,
                           const SHeaderReader &theReader = {});
// A size or count: an integer in 1..theMax.
int32_t fdfHeaderSize(const CDescription &theHeader, const char *theKey, int32_t theMax,
                      const SHeaderReader &theReader = {});
// Reals: NaN and infinities kept (overflowing texts are refused).
double fdfHeaderReal(const CDescription &theHeader, const char *theKey, const SHeaderReader &theReader = {});
double fdfHeaderRealOr(const CDescription &theHeader, const char *theKey, double theDefault,
                       const SHeaderReader &theReader = {});
// A coordinate, spacing or window: finite.
double fdfHeaderFiniteReal(const CDescription &theHeader, const char *theKey, const SHeaderReader &theReader = {});
// "RasterInfo.NullCellValue", 0 when it holds no value, NaN kept.
double fdfHeaderNullValue(const CDescription &theHeader, const SHeaderReader &theReader = {});

// Map registration of a geocoded header, read here for every reader (map
// grids, ENVI map info, GeoTIFF georeferencing, the DEM box of headers).
struct SMapRegistration {
  double mEasting = 0.0;      // "RegistrationCoordinates.LonEasting": outer corner of the upper-left pixel
  double mNorthing = 0.0;     // "RegistrationCoordinates.LatNorthing"
  double mEastSpacing = 0.0;  // "RegistrationCoordinates.PixelSpacingLonEast"
  double mNorthSpacing = 0.0; // "RegistrationCoordinates.PixelSpacingLatNorth", negative for north-up
};

// Corner and spacings, all finite, the spacings not zero. False with the
// failing key and its problem ("holds no value", "is not a finite number
// [inf]", "is not a usable pixel spacing") otherwise.
bool fdfReadMapRegistration(const CDescription &theHeader, SMapRegistration &theRegistration, std::string &theKey,
                            std::string &theProblem);
// UTM zone ("CartographicSystem.Zone", 1 to 60) and hemisphere
// ("CartographicSystem.Hemisphere", "NORTH" in any letter case is north,
// another text south); false like fdfReadMapRegistration.
bool fdfReadUtmZone(const CDescription &theHeader, int32_t &theZone, bool &theNorth, std::string &theKey,
                    std::string &theProblem);
