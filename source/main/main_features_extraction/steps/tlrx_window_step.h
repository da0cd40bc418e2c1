// What the window step programs (texture, normalisation, intensity
// correlation) share around the window machinery: their inputs with headers,
// the size check of co-registered inputs, the result headers, and the stream
// of one input raster's lines as values with validity flags.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "tlrx_description_section.h"
#include "tlrx_raster_file.h"

// Codes of the window steps beside those of the raster file.
constexpr int32_t CTLRX_ERR_SIZE_MISMATCH = 652807; // 10, 6
// Window rows or columns outside CTLRX_WINDOW_MIN_SIZE .. CTLRX_WINDOW_MAX_SIZE.
constexpr int32_t CTLRX_ERR_WINDOW_SIZE = 456961; // 7, 0
constexpr int32_t CTLRX_WINDOW_MIN_SIZE = 3;
constexpr int32_t CTLRX_WINDOW_MAX_SIZE = 500;

// Raises CTLRX_ERR_WINDOW_SIZE (no message) unless both sizes lie in 3 .. 500.
void fdfCheckWindowSize(int32_t theRows, int32_t theCols);

// Whether the line read delivers intensities for a raster of this header:
// "DataUnits" "POWER", or a complex cell type (whose cells are read as
// re^2 + im^2 whatever the data units say).
bool fdfDeliversIntensity(const CDescription &theHeader);

// One input raster of a window step: its header (missing: 261122 with the
// header name), size and whether it delivers intensities, then the open raster and one line of
// values with their validity flags.
class CWindowInput {
public:
  explicit CWindowInput(const char *theName);

  // Opens the raster for reading (after every header check of the step).
  void open();
  // Reads line theLine into values() and mask() (1 valid, 0 no data).
  void readLine(int32_t theLine);
  // Line theLine as floats into theValues (no-data cells hold nullValue()),
  // for steps that test validity themselves.
  void readFloatLine(int32_t theLine, float *theValues) { mRaster.getLine(theValues, theLine); }
  double nullValue() const { return mRaster.getDummyVal(); }
  void close() { mRaster.close(); }

  const std::string &name() const { return mName; }
  const CDescription &header() const { return mHeader; }
  int32_t lines() const { return mLines; }
  int32_t pixels() const { return mPixels; }
  bool deliversIntensity() const { return mIntensity; }
  const double *values() const { return mValues.data(); }
  const int32_t *mask() const { return mMask.data(); }

private:
  std::string mName;
  CDescription mHeader;
  int32_t mLines = 0;
  int32_t mPixels = 0;
  bool mIntensity = false;
  CRasterFile mRaster;
  std::vector<double> mValues;
  std::vector<int32_t> mMask;
};

// theOther must have theFirst's lines and pixels: traces "Error: The number of
// lines does not match (" (or "pixels per line") with both counts and raises
// 652807 without a message.
void fdfCheckSameSize(const CWindowInput &theFirst, const CWindowInput &theOther);

// A float result header made from an input header: cells "FLOAT" with no
// offset, prefix or suffix, null value theNull, and theUnits as "DataUnits"
// (nullptr keeps the input's). A footer or scale factors of the input do not
// describe the written result, so they are reset to none.
void fdfMakeWindowResultHeader(CDescription &theResult, const CDescription &theInput, double theNull,
                               const char *theUnits);

// The result of a pair: "FilesList" of both names; input 1's acquisition
// time as "ACQUISITION TIME" and "MASTER ACQUISITION TIME", input 2's as
// "SLAVE ACQUISITION TIME" (each only when the input has one).
void fdfStampPairInputs(CDescription &theResult, const CWindowInput &theFirst, const CWindowInput &theSecond);

// Usage text of the two-input steps to the trace, after their argument
// count and arguments; theWithNorm adds the normalisation image line.
void fdfTracePairStepUsage(int theArgc, char **theArgv, bool theWithNorm);

// "Number of significant value (no equal to <null> one) = <count>" to the trace.
void fdfTraceSignificantCount(double theNull, int64_t theCount);
