// Command line of the scene simulator. One table lists every option with the
// commands it applies to, its help line and the function that stores it; the
// parser walks the table and the help is printed from it. Whole-run checks
// (counts against lists, null value against cell type, ...) follow parsing.
#include "tlrx_sim_options.h"

#include "tlrx_cell_types.h"
#include "tlrx_description_xml.h"
#include "tlrx_raster_file.h"
#include "tlrx_sim_dates.h"

#include <cerrno>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <sstream>

namespace {

// ------------------------------------------------------------ value parsing

[[noreturn]] void failValue(const std::string &theOption, const std::string &theExpected, const std::string &theText) {
  throw CSimUsageError("option " + theOption + ": expected " + theExpected + ", got '" + theText + "'");
}

int64_t parseInteger(const std::string &theOption, const std::string &theText, int64_t theMin, int64_t theMax) {
  const std::string aExpected = "an integer in " + std::to_string(theMin) + ".." + std::to_string(theMax);
  if (theText.empty() || std::isspace(static_cast<unsigned char>(theText[0])))
    failValue(theOption, aExpected, theText);
  errno = 0;
  char *aEnd = nullptr;
  const long long aValue = std::strtoll(theText.c_str(), &aEnd, 10);
  if (errno != 0 || *aEnd != '\0' || aValue < theMin || aValue > theMax)
    failValue(theOption, aExpected, theText);
  return aValue;
}

uint64_t parseSeed(const std::string &theOption, const std::string &theText) {
  errno = 0;
  char *aEnd = nullptr;
  const bool aDigitsOnly = !theText.empty() && std::strspn(theText.c_str(), "0123456789") == theText.size();
  const unsigned long long aValue = aDigitsOnly ? std::strtoull(theText.c_str(), &aEnd, 10) : 0;
  if (!aDigitsOnly || errno != 0)
    failValue(theOption, "an integer in 0..18446744073709551615", theText);
  return aValue;
}

// A finite decimal number in [theMin, theMax].
double parseReal(const std::string &theOption, const std::string &theText, double theMin, double theMax,
                 const char *theExpected) {
  if (theText.empty() || std::isspace(static_cast<unsigned char>(theText[0])))
    failValue(theOption, theExpected, theText);
  errno = 0;
  char *aEnd = nullptr;
  const double aValue = std::strtod(theText.c_str(), &aEnd);
  if (errno != 0 || *aEnd != '\0' || !std::isfinite(aValue) || aValue < theMin || aValue > theMax)
    failValue(theOption, theExpected, theText);
  return aValue;
}

constexpr double CTLRX_SIM_HUGE = std::numeric_limits<double>::max();

double parseAnyReal(const std::string &theOption, const std::string &theText) {
  return parseReal(theOption, theText, -CTLRX_SIM_HUGE, CTLRX_SIM_HUGE, "a finite number");
}

double parsePositive(const std::string &theOption, const std::string &theText) {
  const double aValue = parseReal(theOption, theText, 0.0, CTLRX_SIM_HUGE, "a positive number");
  if (aValue <= 0.0)
    failValue(theOption, "a positive number", theText);
  return aValue;
}

std::vector<std::string> splitList(const std::string &theText, char theSeparator) {
  std::vector<std::string> aItems;
  std::string aItem;
  std::istringstream aIn(theText);
  while (std::getline(aIn, aItem, theSeparator))
    aItems.push_back(aItem);
  if (!theText.empty() && theText.back() == theSeparator)
    aItems.emplace_back();
  return aItems;
}

// theCount comma-separated items (or theCount or theCount + 1 with theOptional).
std::vector<std::string> splitFields(const std::string &theOption, const std::string &theText, size_t theCount,
                                     const char *theForm, bool theOptional = false) {
  std::vector<std::string> aItems = splitList(theText, ',');
  if (aItems.size() != theCount && !(theOptional && aItems.size() == theCount + 1))
    failValue(theOption, theForm, theText);
  return aItems;
}

// "L0,P0,NL,NP" from the first four items.
SSimBox parseBox(const std::string &theOption, const std::vector<std::string> &theItems) {
  SSimBox aBox;
  const int64_t aLimit = CTLRX_RASTER_FILE_MAX_ROWS;
  aBox.mLine0 = static_cast<int32_t>(parseInteger(theOption, theItems[0], -aLimit, aLimit));
  aBox.mPixel0 = static_cast<int32_t>(parseInteger(theOption, theItems[1], -aLimit, aLimit));
  aBox.mLines = static_cast<int32_t>(parseInteger(theOption, theItems[2], 1, aLimit));
  aBox.mPixels = static_cast<int32_t>(parseInteger(theOption, theItems[3], 1, aLimit));
  return aBox;
}

int32_t parseImageIndex(const std::string &theOption, const std::string &theText) {
  return static_cast<int32_t>(parseInteger(theOption, theText, 1, CTLRX_SIM_MAX_IMAGES));
}

int32_t parseSize(const std::string &theOption, const std::string &theText) {
  return static_cast<int32_t>(parseInteger(theOption, theText, 1, CTLRX_RASTER_FILE_MAX_ROWS));
}

// "K:A,B" (or "K:A" when theSecondOptional, B then equal to A).
SSimImageValue parseImageValue(const std::string &theOption, const std::string &theText, const char *theForm,
                               bool theSecondOptional, double (*theParse)(const std::string &, const std::string &)) {
  const size_t aColon = theText.find(':');
  if (aColon == std::string::npos)
    failValue(theOption, theForm, theText);
  SSimImageValue aValue;
  aValue.mImage = parseImageIndex(theOption, theText.substr(0, aColon));
  const std::vector<std::string> aItems =
      splitList(theText.substr(aColon + 1), ',');
  if (aItems.size() != 2 && !(theSecondOptional && aItems.size() == 1))
    failValue(theOption, theForm, theText);
  aValue.mFirst = theParse(theOption, aItems[0]);
  aValue.mSecond = aItems.size() == 2 ? theParse(theOption, aItems[1]) : aValue.mFirst;
  return aValue;
}

double parseSizeAsReal(const std::string &theOption, const std::string &theText) {
  return parseSize(theOption, theText);
}

// ------------------------------------------------------------- the table

using TSimApply = void (*)(SSimOptions &, const std::string &theOption, const std::string &theValue);

struct SSimOptionSpec {
  const char *mName;  // nullptr: a heading of the help text
  const char *mValue; // value hint; nullptr for a switch
  int mCommands;
  const char *mHelp;
  TSimApply mApply;
};

const SSimOptionSpec sOptionTable[] = {
    {nullptr, nullptr, 0, "Output and layout", nullptr},
    {"--out", "ROOT", CTLRX_SIM_ALL | CTLRX_SIM_SLC,
     "raster name (constant) or root of the names: series ROOT_01 .. ROOT_NN, pair ROOT_1 and ROOT_2",
     [](SSimOptions &o, const std::string &, const std::string &v) { o.mOut = v; }},
    {"--list", "FILE", CTLRX_SIM_ALL | CTLRX_SIM_SLC,
     "list file of the written image names, one per line (default ROOT_list.txt; constant: none)",
     [](SSimOptions &o, const std::string &, const std::string &v) { o.mList = v; }},
    {"--lines", "N", CTLRX_SIM_ALL | CTLRX_SIM_SLC, "lines per image, 1..900000 (default 256)",
     [](SSimOptions &o, const std::string &n, const std::string &v) { o.mLines = parseSize(n, v); }},
    {"--pixels", "N", CTLRX_SIM_ALL | CTLRX_SIM_SLC, "pixels per line, 1..900000 (default 256)",
     [](SSimOptions &o, const std::string &n, const std::string &v) { o.mPixels = parseSize(n, v); }},
    {"--cell-type", "TYPE", CTLRX_SIM_ALL | CTLRX_SIM_SLC,
     "FLOAT (default), DOUBLE, BYTE, UNSIGNED_BYTE, SHORT, UNSIGNED_SHORT, INT, UNSIGNED_INT, "
     "FLOAT_COMPLEX, DOUBLE_COMPLEX, SHORT_COMPLEX, UNSIGNED_SHORT_COMPLEX, BYTE_COMPLEX, UBYTE_COMPLEX "
     "(complex types hold a complex field whose intensity follows the speckle model; unsigned complex "
     "types keep |re| and |im|, so the intensity is kept and the phase folded)",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       o.mCellType = fdfCellTypeFromName(v.c_str());
       if (o.mCellType == CTLRX_CELL_UNKNOWN)
         failValue(n, "a cell type name such as FLOAT or SHORT_COMPLEX", v);
       if (o.mCellType == CTLRX_CELL_BIT)
         throw CSimUsageError("option --cell-type: BIT cannot hold image values; choose another type");
     }},
    {"--units", "UNITS", CTLRX_SIM_ALL,
     "data units: POWER (intensity, default) or AMPLITUDE for series and pair (complex types are written "
     "as SLC); any name of the vocabulary for constant (default NUMBER)",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       if (fdfDataUnitsFromName(v.c_str()) == CTLRX_UNITS_UNKNOWN)
         failValue(n, "a data units name such as POWER or AMPLITUDE", v);
       o.mUnits = v;
     }},
    {"--null", "VALUE", CTLRX_SIM_ALL | CTLRX_SIM_SLC,
     "no-data value written as NullCellValue and into no-data pixels: a number or NaN (default 0); "
     "valid pixels never take it",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       o.mNull = (v == "NaN" || v == "nan" || v == "NAN") ? std::numeric_limits<double>::quiet_NaN()
                                                          : parseReal(n, v, -CTLRX_SIM_HUGE, CTLRX_SIM_HUGE,
                                                                      "a finite number or NaN");
     }},
    {"--scale-factor", "F", CTLRX_SIM_ALL | CTLRX_SIM_SLC,
     "cells store value / F and the header says RealScaleFactor (and ImaginaryScaleFactor) F, so readers get "
     "the value back; use it to fit integer cell types (default 1; values beyond the type are clipped)",
     [](SSimOptions &o, const std::string &n, const std::string &v) { o.mScaleFactor = parsePositive(n, v); }},
    {"--byte-order", "ORDER", CTLRX_SIM_ALL | CTLRX_SIM_SLC, "LSBF (default) or MSBF",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       if (v != "LSBF" && v != "MSBF")
         failValue(n, "LSBF or MSBF", v);
       o.mMSBF = v == "MSBF";
     }},
    {"--seed", "N", CTLRX_SIM_ALL | CTLRX_SIM_SLC, "seed of every random draw (default 1); the same seed gives the same files",
     [](SSimOptions &o, const std::string &n, const std::string &v) { o.mSeed = parseSeed(n, v); }},

    {nullptr, nullptr, 0, "Scene (mean reflectivity of every pixel)", nullptr},
    {"--reflectivity", "R", CTLRX_SIM_SERIES | CTLRX_SIM_PAIR | CTLRX_SIM_SLC,
     "mean intensity of the scene (default 1); the textured scene varies around it",
     [](SSimOptions &o, const std::string &n, const std::string &v) { o.mReflectivity = parsePositive(n, v); }},
    {"--scene", "KIND", CTLRX_SIM_SERIES | CTLRX_SIM_PAIR,
     "fields (default: square fields of random level times a smooth wave) or flat (R everywhere)",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       if (v != "fields" && v != "flat")
         failValue(n, "fields or flat", v);
       o.mFlatScene = v == "flat";
     }},
    {"--field-size", "N", CTLRX_SIM_SERIES | CTLRX_SIM_PAIR, "side of the fields in pixels (default 32)",
     [](SSimOptions &o, const std::string &n, const std::string &v) { o.mFieldSize = parseSize(n, v); }},
    {"--contrast-db", "DB", CTLRX_SIM_SERIES | CTLRX_SIM_PAIR,
     "spread of the field levels around R, in dB, 0..60 (default 6)",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       o.mContrastDb = parseReal(n, v, 0.0, 60.0, "a number in 0..60");
     }},
    {"--flat-box", "L0,P0,NL,NP", CTLRX_SIM_SERIES | CTLRX_SIM_PAIR,
     "homogeneous area: reflectivity exactly R in NL lines from L0 and NP pixels from P0 (repeatable)",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       o.mFlatBoxes.push_back(parseBox(n, splitFields(n, v, 4, "L0,P0,NL,NP")));
     }},

    {nullptr, nullptr, 0, "Time series", nullptr},
    {"--count", "N", CTLRX_SIM_SERIES, "number of images, 1..9999 (default 5, or the length of --dates)",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       o.mCount = static_cast<int32_t>(parseInteger(n, v, 1, CTLRX_SIM_MAX_IMAGES));
       o.mCountGiven = true;
     }},
    {"--looks", "L", CTLRX_SIM_SERIES | CTLRX_SIM_PAIR,
     "number of looks, 1..1000 (default 1): intensity is gamma distributed with shape L and mean the "
     "reflectivity, so its coefficient of variation is 1/sqrt(L)",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       o.mLooks = static_cast<int32_t>(parseInteger(n, v, 1, CTLRX_SIM_MAX_LOOKS));
     }},
    {"--change", "L0,P0,NL,NP,K,F", CTLRX_SIM_SERIES,
     "the box's reflectivity is multiplied by F > 0 from image K on (repeatable)",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       const std::vector<std::string> aItems = splitFields(n, v, 6, "L0,P0,NL,NP,K,F");
       SSimChange aChange;
       aChange.mBox = parseBox(n, aItems);
       aChange.mImage = parseImageIndex(n, aItems[4]);
       aChange.mFactor = parsePositive(n, aItems[5]);
       o.mChanges.push_back(aChange);
     }},
    {"--trend", "L0,P0,NL,NP,DB", CTLRX_SIM_SERIES,
     "the box's reflectivity changes by DB decibels from one image to the next (repeatable)",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       const std::vector<std::string> aItems = splitFields(n, v, 5, "L0,P0,NL,NP,DB");
       SSimTrend aTrend;
       aTrend.mBox = parseBox(n, aItems);
       aTrend.mDbPerImage = parseReal(n, aItems[4], -60.0, 60.0, "a number in -60..60");
       o.mTrends.push_back(aTrend);
     }},

    {nullptr, nullptr, 0, "Acquisition dates (written as \"ACQUISITION TIME\" DD-MMM-YYYY hh:mm:ss.ffffff)", nullptr},
    {"--start", "DATE", CTLRX_SIM_ALL | CTLRX_SIM_SLC,
     "date of the first image, YYYY-MM-DD[Thh:mm[:ss[.ffffff]]] (default 2020-01-01T10:00:00)",
     [](SSimOptions &o, const std::string &, const std::string &v) { o.mStart = v; }},
    {"--interval", "DAYS", CTLRX_SIM_SERIES | CTLRX_SIM_PAIR | CTLRX_SIM_SLC, "days between images, >= 0, decimals allowed (default 12)",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       o.mIntervalDays = parseReal(n, v, 0.0, 100000.0, "a number of days in 0..100000");
     }},
    {"--dates", "D1,D2,...", CTLRX_SIM_ALL | CTLRX_SIM_SLC,
     "explicit dates, one per image in the order written (any order, repeats allowed)",
     [](SSimOptions &o, const std::string &, const std::string &v) { o.mDateTexts = splitList(v, ','); }},

    {nullptr, nullptr, 0, "No-data pixels (set exactly to the null value)", nullptr},
    {"--nodata-box", "L0,P0,NL,NP[,K]", CTLRX_SIM_ALL, "a rectangle, in every image or only in image K (repeatable)",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       const std::vector<std::string> aItems = splitFields(n, v, 4, "L0,P0,NL,NP[,K]", true);
       SSimNoDataBox aBox;
       aBox.mBox = parseBox(n, aItems);
       aBox.mImage = aItems.size() == 5 ? parseImageIndex(n, aItems[4]) : 0;
       o.mNoDataBoxes.push_back(aBox);
     }},
    {"--nodata-fraction", "F", CTLRX_SIM_ALL, "each pixel of each image is no data with probability F in 0..1",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       o.mNoDataFraction = parseReal(n, v, 0.0, 1.0, "a number in 0..1");
     }},

    {nullptr, nullptr, 0, "Geocoding (boxes are lines and pixels of the grid given by --lines, --pixels, "
                          "--origin and --spacing)", nullptr},
    {"--utm", "ZONE{N|S}", CTLRX_SIM_ALL,
     "UTM-GLOBAL images in that zone and hemisphere, e.g. 32N (origin default 500000,5000000; spacing "
     "default 10 m)",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       const char aHemisphere = v.empty() ? '\0' : v.back();
       if (aHemisphere != 'N' && aHemisphere != 'S' && aHemisphere != 'n' && aHemisphere != 's')
         failValue(n, "a zone 1..60 followed by N or S", v);
       o.mZone = static_cast<int32_t>(parseInteger(n, v.substr(0, v.size() - 1), 1, 60));
       o.mNorth = aHemisphere == 'N' || aHemisphere == 'n';
       o.mGeoKind = o.mGeoKind == CTLRX_SIM_GEO_GEOGRAPHIC || o.mGeoKind < 0 ? -1 : CTLRX_SIM_GEO_UTM;
     }},
    {"--geographic", nullptr, CTLRX_SIM_ALL,
     "GEO-GLOBAL images in longitude and latitude (origin default 10,45; spacing default 0.0001 degrees)",
     [](SSimOptions &o, const std::string &, const std::string &) {
       o.mGeoKind = o.mGeoKind == CTLRX_SIM_GEO_UTM || o.mGeoKind < 0 ? -1 : CTLRX_SIM_GEO_GEOGRAPHIC;
     }},
    {"--origin", "X,Y", CTLRX_SIM_ALL, "easting (longitude) and northing (latitude) of the upper-left corner",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       const std::vector<std::string> aItems = splitFields(n, v, 2, "X,Y");
       o.mOriginX = parseAnyReal(n, aItems[0]);
       o.mOriginY = parseAnyReal(n, aItems[1]);
       o.mOriginGiven = true;
     }},
    {"--spacing", "S[,SN]", CTLRX_SIM_ALL,
     "pixel spacing east (and north; default the same), positive; headers hold the north spacing negated",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       const std::vector<std::string> aItems = splitFields(n, v, 1, "S[,SN]", true);
       o.mSpacingX = parsePositive(n, aItems[0]);
       o.mSpacingY = aItems.size() == 2 ? parsePositive(n, aItems[1]) : o.mSpacingX;
       o.mSpacingGiven = true;
     }},
    {"--image-size", "K:LINES,PIXELS", CTLRX_SIM_SERIES, "another size for image K (repeatable)",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       o.mImageSizes.push_back(parseImageValue(n, v, "K:LINES,PIXELS", false, parseSizeAsReal));
     }},
    {"--image-origin", "K:X,Y", CTLRX_SIM_SERIES,
     "another upper-left corner for image K (geocoded only; repeatable)",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       o.mImageOrigins.push_back(parseImageValue(n, v, "K:X,Y", false, parseAnyReal));
     }},
    {"--image-spacing", "K:S[,SN]", CTLRX_SIM_SERIES,
     "another spacing for image K (geocoded only; repeatable); the scene is sampled at the new pixel centres",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       o.mImageSpacings.push_back(parseImageValue(n, v, "K:S[,SN]", true, parsePositive));
     }},

    {nullptr, nullptr, 0, "Correlated pair", nullptr},
    {"--coherence", "G", CTLRX_SIM_PAIR | CTLRX_SIM_SLC, "coherence |gamma| of the two complex fields, 0..1 (default 0.8)",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       o.mCoherence0 = o.mCoherence1 = parseReal(n, v, 0.0, 1.0, "a number in 0..1");
     }},
    {"--coherence-ramp", "G0,G1", CTLRX_SIM_PAIR | CTLRX_SIM_SLC, "coherence rising linearly from G0 at pixel 0 to G1 at the last pixel",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       const std::vector<std::string> aItems = splitFields(n, v, 2, "G0,G1");
       o.mCoherence0 = parseReal(n, aItems[0], 0.0, 1.0, "a number in 0..1");
       o.mCoherence1 = parseReal(n, aItems[1], 0.0, 1.0, "a number in 0..1");
     }},
    {"--slc", nullptr, CTLRX_SIM_PAIR,
     "also write the complex pair ROOT_slc_1 and ROOT_slc_2 (FLOAT_COMPLEX, SLC; needs --looks 1)",
     [](SSimOptions &o, const std::string &, const std::string &) { o.mSlc = true; }},
    {"--phase-ramp", "FL,FP", CTLRX_SIM_PAIR | CTLRX_SIM_SLC,
     "interferometric phase of slc_1 x conj(slc_2): 2 pi (FL line + FP pixel), FL and FP in cycles per "
     "line and per pixel (default 0,0)",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       const std::vector<std::string> aItems = splitFields(n, v, 2, "FL,FP");
       o.mFringesPerLine = parseReal(n, aItems[0], -1e6, 1e6, "a number of cycles in -1e6..1e6");
       o.mFringesPerPixel = parseReal(n, aItems[1], -1e6, 1e6, "a number of cycles in -1e6..1e6");
     }},

    {nullptr, nullptr, 0, "Single-look complex pair (slc: ROOT_1 master, ROOT_2 slave)", nullptr},
    {"--band-oversampling", "OSR[,OSR_AZ]", CTLRX_SIM_SLC,
     "sampling rate / bandwidth of the circular Gaussian speckle in range and azimuth, 1..4 (default 1.2)",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       const std::vector<std::string> aItems = splitFields(n, v, 1, "OSR[,OSR_AZ]", true);
       o.mBandOversampling[0] = parseReal(n, aItems[0], 1.0, 4.0, "a number in 1..4");
       o.mBandOversampling[1] = aItems.size() == 2 ? parseReal(n, aItems[1], 1.0, 4.0, "a number in 1..4")
                                                   : o.mBandOversampling[0];
     }},
    {"--coherence-box", "L0,P0,NL,NP,G", CTLRX_SIM_SLC, "coherence G inside a rectangle of the master (repeatable)",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       const std::vector<std::string> aItems = splitFields(n, v, 5, "L0,P0,NL,NP,G");
       o.mCoherenceBoxes.emplace_back(parseBox(n, aItems), parseReal(n, aItems[4], 0.0, 1.0, "a number in 0..1"));
     }},
    {"--shift", "RG,AZ", CTLRX_SIM_SLC,
     "constant shift of the slave (slave - master position) in pixels and lines, as a Fourier phase ramp",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       const std::vector<std::string> aItems = splitFields(n, v, 2, "RG,AZ");
       for (size_t i = 0; i < 2; ++i)
         o.mShift[i] = parseReal(n, aItems[i], -1e4, 1e4, "a number in -1e4..1e4");
     }},
    {"--shift-field", "R0,RX,RY,A0,AX,AY", CTLRX_SIM_SLC,
     "affine shift of the slave: range R0 + RX x + RY y, azimuth A0 + AX x + AY y at master pixel x, line y "
     "(0-based); the band-limited signal is evaluated at the moved positions column by column, then line by "
     "line, by exact DFT sums (chirp-z)",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       const std::vector<std::string> aItems = splitFields(n, v, 6, "R0,RX,RY,A0,AX,AY");
       for (size_t i = 0; i < 6; ++i)
         o.mField[i] = parseReal(n, aItems[i], -1e4, 1e4, "a number in -1e4..1e4");
       o.mFieldGiven = true;
     }},
    {"--topography", "RAD", CTLRX_SIM_SLC, "adds hills of peak phase RAD radians to the interferometric phase",
     [](SSimOptions &o, const std::string &n, const std::string &v) { o.mTopography = parseAnyReal(n, v); }},
    {"--dem", "H", CTLRX_SIM_SLC,
     "also writes ROOT_dem (FLOAT, metres, on the master grid): the hills of --topography as heights of peak H "
     "metres, so the topographic phase is RAD / H radians per metre of height",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       o.mDemHeight = parseReal(n, v, 1e-3, 1e5, "a height in 0.001..100000 metres");
     }},
    {"--command-file", "FILE", CTLRX_SIM_SLC,
     "also writes a parameter file of the coherence command for the pair: output root ROOT_cc, one look, a "
     "5 x 5 window, co-registration estimated, ROOT_dem as elevation model with --dem, a GeoTIFF copy",
     [](SSimOptions &o, const std::string &, const std::string &v) { o.mCommandFile = v; }},
    {"--doppler", "F1,F2", CTLRX_SIM_SLC,
     "Doppler centroids of master and slave as fractions of the PRF, -0.5..0.5: both see one reflectivity, each "
     "through the azimuth band of width PRF / OSR_AZ centred at its own centroid, the same content at the same "
     "frequency (centroids are ground frequencies: 0.45 and -0.45 lie 0.9 PRF apart), so the pair's coherence is "
     "g (1 - |F1 - F2| OSR_AZ) until both are filtered to the common band",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       const std::vector<std::string> aItems = splitFields(n, v, 2, "F1,F2");
       for (size_t i = 0; i < 2; ++i)
         o.mDoppler[i] = parseReal(n, aItems[i], -0.5, 0.5, "a number in -0.5..0.5");
     }},
    {"--range-band-shift", "F", CTLRX_SIM_SLC,
     "geometric decorrelation: master and slave see one reflectivity through range bands moved by F times the "
     "range bandwidth, 0 <= F < 1, the master the lower end and the slave the upper end, each brought to "
     "baseband; master x conj(slave) then shows a range fringe of F / OSR cycles per pixel and a coherence "
     "1 - F times the chosen one until both are filtered to the common band (needs (1 + F) / OSR <= 1, so "
     "that the reflectivity's band fits the sampling)",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       o.mRangeBandShift = parseReal(n, v, 0.0, 1.0, "a number in 0..1 (1 excluded)");
       if (o.mRangeBandShift >= 1.0)
         failValue(n, "a number in 0..1 (1 excluded)", v);
     }},

    {nullptr, nullptr, 0, "Constant image", nullptr},
    {"--value", "V[,IM]", CTLRX_SIM_CONSTANT, "the value of every pixel (complex types: real and imaginary part)",
     [](SSimOptions &o, const std::string &n, const std::string &v) {
       const std::vector<std::string> aItems = splitFields(n, v, 1, "V[,IM]", true);
       o.mValueRe = parseAnyReal(n, aItems[0]);
       o.mValueIm = aItems.size() == 2 ? parseAnyReal(n, aItems[1]) : 0.0;
       o.mValueGiven = true;
     }},
};

struct SSimCommandName {
  const char *mName;
  int mCommand;
};
const SSimCommandName sCommands[] = {
    {"series", CTLRX_SIM_SERIES}, {"pair", CTLRX_SIM_PAIR}, {"constant", CTLRX_SIM_CONSTANT}, {"slc", CTLRX_SIM_SLC}};

const char *commandName(int theCommand) {
  for (const SSimCommandName &aCommand : sCommands)
    if (aCommand.mCommand == theCommand)
      return aCommand.mName;
  return "?";
}

const SSimOptionSpec *findOption(const std::string &theName) {
  for (const SSimOptionSpec &aSpec : sOptionTable)
    if (aSpec.mName != nullptr && theName == aSpec.mName)
      return &aSpec;
  return nullptr;
}

// ------------------------------------------------------- whole-run checks

// Raster names whose header would not land beside them: the header reader
// takes such a name as the header itself.
const char *const sHeaderSuffixes[] = {"_hdr", ".sml", "_par", "_map", ".orb", "_orb_hdr", "_orb.sml"};

void checkName(const std::string &theName) {
  for (const char *aSuffix : sHeaderSuffixes)
    if (fdfEndsWithNoCase(theName, aSuffix))
      throw CSimUsageError("raster name '" + theName + "' ends in '" + aSuffix +
                           "', which names a header file; choose another --out");
}

// Integer cell types can store the null value only when it is a whole number
// within the range of their values.
void checkNullFitsCellType(const SSimOptions &theOptions) {
  struct SRange {
    int32_t mCellType;
    double mMin;
    double mMax;
  };
  static const SRange aRanges[] = {
      {CTLRX_CELL_BYTE, -128.0, 127.0},           {CTLRX_CELL_BYTE_COMPLEX, -128.0, 127.0},
      {CTLRX_CELL_UNSIGNED_BYTE, 0.0, 255.0},     {CTLRX_CELL_UBYTE_COMPLEX, 0.0, 255.0},
      {CTLRX_CELL_SHORT, -32768.0, 32767.0},      {CTLRX_CELL_SHORT_COMPLEX, -32768.0, 32767.0},
      {CTLRX_CELL_UNSIGNED_SHORT, 0.0, 65535.0},  {CTLRX_CELL_UNSIGNED_SHORT_COMPLEX, 0.0, 65535.0},
      {CTLRX_CELL_INT, -2147483648.0, 2147483647.0}, {CTLRX_CELL_UNSIGNED_INT, 0.0, 4294967295.0},
  };
  for (const SRange &aRange : aRanges) {
    if (aRange.mCellType != theOptions.mCellType)
      continue;
    const double aNull = theOptions.mNull;
    if (std::isnan(aNull) || aNull != std::floor(aNull) || aNull < aRange.mMin || aNull > aRange.mMax) {
      char aText[256];
      std::snprintf(aText, sizeof aText, "option --null: %s cannot store %.17g; give a whole number in %.0f..%.0f",
                    fdfCellTypeName(aRange.mCellType), aNull, aRange.mMin, aRange.mMax);
      throw CSimUsageError(aText);
    }
  }
}

void checkUnits(SSimOptions &theOptions) {
  const bool aComplex = fdfIsComplexCellType(theOptions.mCellType);
  if (theOptions.mCommand == CTLRX_SIM_CONSTANT) {
    if (theOptions.mUnits.empty())
      theOptions.mUnits = aComplex ? "SLC" : "NUMBER";
    return;
  }
  if (theOptions.mCommand == CTLRX_SIM_SLC) {
    if (theOptions.mCellType == CTLRX_CELL_FLOAT)
      theOptions.mCellType = CTLRX_CELL_FLOAT_COMPLEX;
    if (theOptions.mCellType != CTLRX_CELL_FLOAT_COMPLEX && theOptions.mCellType != CTLRX_CELL_SHORT_COMPLEX)
      throw CSimUsageError("slc writes FLOAT_COMPLEX or SHORT_COMPLEX images, not " +
                           std::string(fdfCellTypeName(theOptions.mCellType)));
    theOptions.mUnits = "SLC";
    if (theOptions.mFieldGiven && (theOptions.mShift[0] != 0.0 || theOptions.mShift[1] != 0.0))
      throw CSimUsageError("give either --shift or --shift-field, not both");
    if ((1.0 + theOptions.mRangeBandShift) / theOptions.mBandOversampling[0] > 1.0 + 1e-12) {
      char aText[200];
      std::snprintf(aText, sizeof aText,
                    "option --range-band-shift: a shift of %g needs a range band oversampling of at least %g, not %g",
                    theOptions.mRangeBandShift, 1.0 + theOptions.mRangeBandShift, theOptions.mBandOversampling[0]);
      throw CSimUsageError(aText);
    }
    return;
  }
  if (theOptions.mCommand == CTLRX_SIM_PAIR && aComplex)
    throw CSimUsageError("pair writes real intensity or amplitude images; use --slc for the complex pair");
  if (aComplex) {
    if (!theOptions.mUnits.empty() && theOptions.mUnits != "SLC")
      throw CSimUsageError("option --units: complex cell types are written as SLC, not " + theOptions.mUnits);
    theOptions.mUnits = "SLC";
    return;
  }
  if (theOptions.mUnits.empty())
    theOptions.mUnits = "POWER";
  if (theOptions.mUnits != "POWER" && theOptions.mUnits != "AMPLITUDE")
    throw CSimUsageError("option --units: " + std::string(commandName(theOptions.mCommand)) +
                         " writes POWER or AMPLITUDE images, not " + theOptions.mUnits);
}

void checkImageIndex(const char *theOption, int32_t theImage, int32_t theCount) {
  if (theImage > theCount)
    throw CSimUsageError(std::string("option ") + theOption + ": image " + std::to_string(theImage) +
                         " does not exist (the run writes " + std::to_string(theCount) + ")");
}

void checkImageIndices(const SSimOptions &theOptions) {
  const int32_t aCount = fdfSimImageCount(theOptions);
  for (const SSimChange &aChange : theOptions.mChanges)
    checkImageIndex("--change", aChange.mImage, aCount);
  for (const SSimNoDataBox &aBox : theOptions.mNoDataBoxes)
    checkImageIndex("--nodata-box", aBox.mImage, aCount);
  for (const SSimImageValue &aValue : theOptions.mImageSizes)
    checkImageIndex("--image-size", aValue.mImage, aCount);
  for (const SSimImageValue &aValue : theOptions.mImageOrigins)
    checkImageIndex("--image-origin", aValue.mImage, aCount);
  for (const SSimImageValue &aValue : theOptions.mImageSpacings)
    checkImageIndex("--image-spacing", aValue.mImage, aCount);
}

void resolveDates(SSimOptions &theOptions) {
  const int32_t aCount = fdfSimImageCount(theOptions);
  std::string aError;
  theOptions.mDates.clear();
  if (!theOptions.mDateTexts.empty()) {
    if (static_cast<int32_t>(theOptions.mDateTexts.size()) != aCount)
      throw CSimUsageError("option --dates: " + std::to_string(theOptions.mDateTexts.size()) + " dates for " +
                           std::to_string(aCount) + " images");
    for (const std::string &aText : theOptions.mDateTexts) {
      int64_t aMicros = 0;
      if (!fdfSimParseIsoDate(aText, aMicros, aError))
        throw CSimUsageError("option --dates: '" + aText + "': " + aError);
      theOptions.mDates.push_back(aMicros);
    }
    return;
  }
  int64_t aStart = 0;
  if (!fdfSimParseIsoDate(theOptions.mStart, aStart, aError))
    throw CSimUsageError("option --start: '" + theOptions.mStart + "': " + aError);
  const double aStep = theOptions.mIntervalDays * static_cast<double>(CTLRX_SIM_MICROS_PER_DAY);
  for (int32_t k = 0; k < aCount; ++k) {
    // Checked in floating point first: a long series of long intervals overflows 64 bits.
    const double aOffset = aStep * k;
    const bool aInRange = aOffset < 1e17 && fdfSimDateInRange(aStart + std::llround(aOffset));
    if (!aInRange)
      throw CSimUsageError("option --interval: image " + std::to_string(k + 1) +
                           " would be acquired after the year 2100");
    theOptions.mDates.push_back(aStart + std::llround(aOffset));
  }
}

void checkGeocoding(SSimOptions &theOptions) {
  if (theOptions.mGeoKind < 0)
    throw CSimUsageError("give either --utm or --geographic, not both");
  const bool aGeocoded = theOptions.mGeoKind != CTLRX_SIM_GEO_NONE;
  if (!aGeocoded) {
    if (theOptions.mOriginGiven || theOptions.mSpacingGiven || !theOptions.mImageOrigins.empty() ||
        !theOptions.mImageSpacings.empty())
      throw CSimUsageError("--origin, --spacing, --image-origin and --image-spacing need --utm or --geographic");
    return;
  }
  const bool aUtm = theOptions.mGeoKind == CTLRX_SIM_GEO_UTM;
  if (!theOptions.mOriginGiven) {
    theOptions.mOriginX = aUtm ? 500000.0 : 10.0;
    theOptions.mOriginY = aUtm ? 5000000.0 : 45.0;
  }
  if (!theOptions.mSpacingGiven)
    theOptions.mSpacingX = theOptions.mSpacingY = aUtm ? 10.0 : 0.0001;
  if (aUtm)
    return;
  // Geographic grids must stay on the globe.
  for (int32_t k = 1; k <= fdfSimImageCount(theOptions); ++k) {
    const SSimGrid aGrid = fdfSimImageGrid(theOptions, k);
    const double aSouth = aGrid.mY0 - aGrid.mLines * aGrid.mSpacingY;
    const double aEast = aGrid.mX0 + aGrid.mPixels * aGrid.mSpacingX;
    if (aGrid.mY0 > 90.0 || aSouth < -90.0 || aGrid.mX0 < -180.0 || aEast > 360.0)
      throw CSimUsageError("image " + std::to_string(k) +
                           " leaves the globe: latitudes must stay in -90..90 and longitudes in -180..360");
  }
}

void checkOptions(SSimOptions &theOptions) {
  if (theOptions.mOut.empty())
    throw CSimUsageError("--out is required");
  if (theOptions.mCommand == CTLRX_SIM_CONSTANT && !theOptions.mValueGiven)
    throw CSimUsageError("constant needs --value");
  if (theOptions.mCommand == CTLRX_SIM_SERIES && !theOptions.mCountGiven && !theOptions.mDateTexts.empty())
    theOptions.mCount = static_cast<int32_t>(theOptions.mDateTexts.size());
  if (theOptions.mSlc && theOptions.mLooks != 1)
    throw CSimUsageError("--slc writes single-look complex images and needs --looks 1");
  checkUnits(theOptions);
  checkNullFitsCellType(theOptions);
  checkImageIndices(theOptions);
  checkGeocoding(theOptions);
  resolveDates(theOptions);
  for (int32_t k = 1; k <= fdfSimImageCount(theOptions); ++k)
    checkName(fdfSimImageName(theOptions, k));
  if (theOptions.mList.empty() && theOptions.mCommand != CTLRX_SIM_CONSTANT)
    theOptions.mList = theOptions.mOut + "_list.txt";
}

std::string wrap(const std::string &theText, size_t theIndent, size_t theWidth) {
  std::string aOut;
  std::string aLine;
  std::istringstream aWords(theText);
  for (std::string aWord; aWords >> aWord;) {
    if (!aLine.empty() && aLine.size() + 1 + aWord.size() > theWidth) {
      aOut += std::string(theIndent, ' ') + aLine + "\n";
      aLine.clear();
    }
    aLine += (aLine.empty() ? "" : " ") + aWord;
  }
  if (!aLine.empty())
    aOut += std::string(theIndent, ' ') + aLine + "\n";
  return aOut;
}

std::string commandsOf(int theMask) {
  if (theMask == CTLRX_SIM_ALL)
    return "";
  std::string aText;
  for (const SSimCommandName &aCommand : sCommands)
    if ((theMask & aCommand.mCommand) != 0)
      aText += (aText.empty() ? " [" : ", ") + std::string(aCommand.mName);
  return aText + "]";
}

} // namespace

bool fdfSimWantsHelp(const std::vector<std::string> &theArgs) {
  if (!theArgs.empty() && theArgs[0] == "help")
    return true;
  for (const std::string &aArg : theArgs)
    if (aArg == "--help" || aArg == "-h")
      return true;
  return false;
}

const char *fdfSimUsageLine() {
  return "usage: tlrx_simulate {series|pair|constant|slc} --out ROOT [options]  (tlrx_simulate --help for the "
         "options)";
}

SSimOptions fdfSimParseOptions(const std::vector<std::string> &theArgs) {
  SSimOptions aOptions;
  if (theArgs.empty())
    throw CSimUsageError("missing command");
  for (const SSimCommandName &aCommand : sCommands)
    if (theArgs[0] == aCommand.mName)
      aOptions.mCommand = aCommand.mCommand;
  if (aOptions.mCommand == 0)
    throw CSimUsageError("unknown command '" + theArgs[0] + "' (series, pair, constant or slc)");
  for (size_t i = 1; i < theArgs.size(); ++i) {
    std::string aName = theArgs[i];
    std::string aValue;
    bool aInline = false;
    const size_t aEquals = aName.find('=');
    if (aName.compare(0, 2, "--") == 0 && aEquals != std::string::npos) {
      aValue = aName.substr(aEquals + 1);
      aName.erase(aEquals);
      aInline = true;
    }
    const SSimOptionSpec *aSpec = findOption(aName);
    if (aSpec == nullptr)
      throw CSimUsageError("unknown option '" + aName + "'");
    if ((aSpec->mCommands & aOptions.mCommand) == 0)
      throw CSimUsageError("option " + aName + " does not apply to " + commandName(aOptions.mCommand));
    if (aSpec->mValue == nullptr && aInline)
      throw CSimUsageError("option " + aName + " takes no value");
    if (aSpec->mValue != nullptr && !aInline) {
      if (i + 1 >= theArgs.size())
        throw CSimUsageError("option " + aName + " needs a value " + aSpec->mValue);
      aValue = theArgs[++i];
    }
    aSpec->mApply(aOptions, aName, aValue);
  }
  checkOptions(aOptions);
  return aOptions;
}

int32_t fdfSimImageCount(const SSimOptions &theOptions) {
  switch (theOptions.mCommand) {
  case CTLRX_SIM_SERIES: return theOptions.mCount;
  case CTLRX_SIM_PAIR:
  case CTLRX_SIM_SLC: return 2;
  default: return 1;
  }
}

SSimGrid fdfSimReferenceGrid(const SSimOptions &theOptions) {
  SSimGrid aGrid;
  aGrid.mLines = theOptions.mLines;
  aGrid.mPixels = theOptions.mPixels;
  if (theOptions.mGeoKind != CTLRX_SIM_GEO_NONE) {
    aGrid.mX0 = theOptions.mOriginX;
    aGrid.mY0 = theOptions.mOriginY;
    aGrid.mSpacingX = theOptions.mSpacingX;
    aGrid.mSpacingY = theOptions.mSpacingY;
  }
  return aGrid;
}

SSimGrid fdfSimImageGrid(const SSimOptions &theOptions, int32_t theImage) {
  SSimGrid aGrid = fdfSimReferenceGrid(theOptions);
  // The last replacement given for an image wins.
  for (const SSimImageValue &aValue : theOptions.mImageSizes)
    if (aValue.mImage == theImage) {
      aGrid.mLines = static_cast<int32_t>(aValue.mFirst);
      aGrid.mPixels = static_cast<int32_t>(aValue.mSecond);
    }
  for (const SSimImageValue &aValue : theOptions.mImageOrigins)
    if (aValue.mImage == theImage) {
      aGrid.mX0 = aValue.mFirst;
      aGrid.mY0 = aValue.mSecond;
    }
  for (const SSimImageValue &aValue : theOptions.mImageSpacings)
    if (aValue.mImage == theImage) {
      aGrid.mSpacingX = aValue.mFirst;
      aGrid.mSpacingY = aValue.mSecond;
    }
  return aGrid;
}

std::string fdfSimImageName(const SSimOptions &theOptions, int32_t theImage) {
  switch (theOptions.mCommand) {
  case CTLRX_SIM_SERIES: {
    const int aWidth = theOptions.mCount >= 1000 ? 4 : theOptions.mCount >= 100 ? 3 : 2;
    char aSuffix[16];
    std::snprintf(aSuffix, sizeof aSuffix, "_%0*d", aWidth, static_cast<int>(theImage));
    return theOptions.mOut + aSuffix;
  }
  case CTLRX_SIM_PAIR:
  case CTLRX_SIM_SLC: return theOptions.mOut + "_" + std::to_string(theImage);
  default: return theOptions.mOut;
  }
}

std::string fdfSimHelpText() {
  std::string aText =
      "tlrx_simulate: writes simulated SAR scenes with known truth, each raster with its header (NAME.sml)\n"
      "and its ENVI header when the runtime writes one.\n\n"
      "Usage:\n"
      "  tlrx_simulate series   --out ROOT [options]   dated time series ROOT_01 .. ROOT_NN\n"
      "  tlrx_simulate pair     --out ROOT [options]   two images ROOT_1, ROOT_2 of known coherence\n"
      "  tlrx_simulate constant --out NAME --value V [options]   one constant image NAME\n"
      "  tlrx_simulate slc      --out ROOT [options]   single-look complex pair ROOT_1 (master), ROOT_2 (slave)\n"
      "  tlrx_simulate --help\n\n"
      "Speckle model: at a pixel of reflectivity R an L-look intensity is R times a gamma variable of shape L\n"
      "and mean 1 (exponential for L = 1); AMPLITUDE images hold its square root; complex cells hold\n"
      "sqrt(intensity) with a uniform random phase. The pair draws, per look, two unit circular complex\n"
      "Gaussians x1 and x2 and writes z1 = s x1 and z2 = s (g x1 + sqrt(1 - g^2) x2), s = sqrt(R), as\n"
      "intensities |z|^2 averaged over the looks (single-look intensity correlation coefficient g^2).\n\n"
      "The configuration is read as by the main program: TELLURIX_INIT_DIR, else the installation's\n"
      "etc/tellurix next to the executable. Exit status: 0 success, 1 a failure while writing, 2 a bad\n"
      "command line.\n\n"
      "Options (values also as --option=value; the commands an option is limited to are in brackets):\n";
  for (const SSimOptionSpec &aSpec : sOptionTable) {
    if (aSpec.mName == nullptr) {
      aText += std::string("\n ") + aSpec.mHelp + "\n";
      continue;
    }
    aText += "  " + std::string(aSpec.mName) + (aSpec.mValue != nullptr ? std::string(" ") + aSpec.mValue : "") +
             commandsOf(aSpec.mCommands) + "\n";
    aText += wrap(aSpec.mHelp, 6, 92);
  }
  aText +=
      "\nExamples:\n"
      "  # 5 dates, 12 days apart, UTM 32N; a field brightens 4x from date 3; a no-data rectangle\n"
      "  tlrx_simulate series --out demo/s --count 5 --utm 32N --origin 600000,5100000 --spacing 20 \\\n"
      "      --change 40,40,48,64,3,4 --nodata-box 200,0,56,40 --null -9999 --seed 7\n"
      "  # homogeneous 4-look intensities for statistics, dates given explicitly, 16-bit cells\n"
      "  tlrx_simulate series --out t/h --scene flat --reflectivity 2.5 --looks 4 \\\n"
      "      --dates 2021-03-05,2021-01-10T09:30:15.5 --cell-type UNSIGNED_SHORT --scale-factor 0.001\n"
      "  # a geographic series whose third image covers another extent at a coarser spacing\n"
      "  tlrx_simulate series --out g/s --count 3 --geographic --origin 11.0,46.0 --spacing 0.0002 \\\n"
      "      --image-origin 3:11.01,45.99 --image-spacing 3:0.0004 --image-size 3:128,128\n"
      "  # a pair whose coherence rises from 0.2 to 0.95 across the columns, with its SLC pair\n"
      "  tlrx_simulate pair --out p/pair --scene flat --coherence-ramp 0.2,0.95 --slc --phase-ramp 0,0.02\n"
      "  # an SLC pair at coherence 0.8 whose slave is moved by an affine field, with a decorrelated box\n"
      "  tlrx_simulate slc --out s/pair --lines 1024 --pixels 1024 --shift-field 0.3,4e-4,-2e-4,-0.7,2e-4,4e-4 \\\n"
      "      --coherence-box 0,0,256,410,0 --cell-type SHORT_COMPLEX --reflectivity 10000\n"
      "  # a pair for the coherence command: shift, fringes over hills with their elevation model\n"
      "  tlrx_simulate slc --out c/pair --lines 512 --pixels 512 --shift-field 0.4,2e-4,0,-0.3,0,1e-4 \\\n"
      "      --coherence-ramp 0.2,0.95 --phase-ramp 0.01,0.05 --topography 20 --dem 400 --command-file c/cc.xml\n"
      "  # a constant image of 4 with NaN as no-data value\n"
      "  tlrx_simulate constant --out c/four --value 4 --null NaN --nodata-box 0,0,2,2\n";
  return aText;
}
