// GeoTIFF quick-looks of rasters: statistics on a sample of the image, a
// stretch of the values into grey levels, an 8-bit striped GeoTIFF, and an
// XML header for the TIFF (the TIFF name with "_hdr", so "X.tif.sml") that
// copies the raster's header and records the stretch:
//
//   RasterInfo.TiffMinValue  O     value = O + (level / S)^(1/E)
//   RasterInfo.TiffScale     S     for levels 0..TiffMaxValue's level (254);
//   RasterInfo.TiffExponent  E     level 255 (NullCellValue) marks null cells
//   RasterInfo.TiffMaxValue  the value of the top level
//   RasterInfo.TiffRowScale, TiffColScale  the reduction factors
//   RasterInfo.CellType "UNSIGNED_BYTE", the quick-look's size and spacings
//
// Phase data wrap round (levels 0..254 cover one cycle from -pi), class
// numbers are their own levels. With the histogram stretch the four keys
// give the linear stretch of the histogram's range, and the value of every
// level stands in "RasterInfo.OtherInfo" under "TiffLevelValues".
#pragma once

#include <cstdint>

#include "tlrx_errors.h"

// Positions in the argument vector of make_tiff.
constexpr int CTLRXGC_INPUT_POS = 1;
constexpr int CTLRXGC_OUTPUT_POS = 2;
constexpr int CTLRXGC_SAT_DEF_POS = 3;
constexpr int CTLRXGC_COLS_REDUCTION_POS = 4;
constexpr int CTLRXGC_ROWS_REDUCTION_POS = 5;
constexpr int CTLRXGC_SCALE_IN_POS = 6;
constexpr int CTLRXGC_EXPONENT_POS = 7;
constexpr int CTLRXGC_COLS_INVERT_POS = 9;
constexpr int CTLRXGC_ROWS_INVERT_POS = 10;

// Converts raster theInputName into the GeoTIFF theTiffName. Returns 0;
// every failure raises (codes above, or those of the raster file and the
// progress protocol).
//   theSaturation      0 selects 1/3 (also negative or undefined values)
//   theRowReduction,   output rows = rows / n, columns = columns / n;
//   theColReduction    below 1 counts as 1, above the image size as the size
//   theGain            "scale input"; negative (or 0) counts as 1
//   theExponent        power of the stretch; not above -0.9 (or 0) counts as 1
//   theInvertRows/Cols mirror top to bottom / left to right (so does "OK" in
//                      the header's TiffRowsInvert / TiffColsInvert)
//   theFlag, theLastFlag  reserved (0 by every caller)
//   theHistogram       equalising histogram stretch over theHistogramSize classes
//   theLevels          top data level (254; outside 1..254 counts as 254)
//   theForcedMin/Max   when given, the ends of the stretch window
//   theSample...       sample window (inclusive); -1 chooses that bound
//                      automatically (the central third)
int32_t tlrx_raster_to_geotiff(const char *theInputName, const char *theTiffName, double theSaturation,
                               int32_t theRowReduction, int32_t theColReduction, double theGain, double theExponent,
                               bool theInvertRows, bool theInvertCols, bool theFlag, bool theHistogram,
                               int32_t theLevels, int32_t theHistogramSize, const double *theForcedMin,
                               const double *theForcedMax, int32_t theSampleRowStart, int32_t theSampleRowEnd,
                               int32_t theSampleColStart, int32_t theSampleColEnd, bool theLastFlag);

// The commands' call: theRasterName into theRasterName + ".tif" with the
// given saturation and the standard arguments (no reduction, gain and
// exponent 1, no inversion, no histogram, 254 levels, automatic sample).
int32_t fdfRasterQuickLook(const char *theRasterName, double theSaturation);

// Argument-vector entry of the step runner ("geotiff conversion"):
// argv[1] raster, argv[2] TIFF, then optional saturation (decimal, 1/3),
// column and row reductions ("%d", 1), gain ("%lf", 1.0), exponent
// (decimal, 1.0), argv[8] unused, invert columns and invert rows (exactly
// "OK"). Fewer than two names raise 130560.
int32_t make_tiff(int theArgc, char **theArgv);
