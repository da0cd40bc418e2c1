// The window step runner and what the window step programs (texture,
// normalisation, intensity correlation, and later steps on a moving window)
// share around the window machinery: their arguments with checked numbers,
// the window rule (shape, border and size limits), their inputs with headers
// and the size check of co-registered inputs, the line loop with its
// progress, and the result headers. A step supplies only its traces, its
// result header and the per-line formulas of its measure.
#pragma once

#include <complex>
#include <cstdint>
#include <functional>
#include <initializer_list>
#include <memory>
#include <string>
#include <vector>
#include "tlrx_error_codes.h"

#include "tlrx_description_section.h"
#include "tlrx_raster_file.h"
#include "tlrx_window_sums.h"

class CResultRaster;

// Window rows or columns outside CTLRX_WINDOW_MIN_SIZE .. CTLRX_WINDOW_MAX_SIZE
// raise CTLRX_ERR_WINDOW_SIZE; sizes of the exact rule below 2 (or above the
// maximum) raise CTLRX_ERR_ARGUMENTS.
constexpr int32_t CTLRX_WINDOW_MIN_SIZE = 3;
constexpr int32_t CTLRX_WINDOW_MAX_SIZE = 500;

// Window rule of a step: how the window meets the edges (tlrx_window_sums.h),
// the limits of its sizes and the code raised, without a message, for a size
// outside them (and, with a message, for a size that is not an integer).
struct SWindowRule {
  ETLRXWindowBorder mBorder;
  int32_t mMinSize;
  int32_t mMaxSize;
  int32_t mSizeCode;
};
// Clipped windows of 3 .. 500, K + 1 columns for an even K: the texture and
// intensity correlation steps.
constexpr SWindowRule CTLRX_CLIPPED_WINDOW_RULE{ETLRXWindowBorder::kClipped, CTLRX_WINDOW_MIN_SIZE,
                                                CTLRX_WINDOW_MAX_SIZE, CTLRX_ERR_WINDOW_SIZE};
// Exact R x K windows of at least 2 with border pixels set to the null value,
// as coherence estimation wants them. The maximum bounds the ring's memory.
constexpr SWindowRule CTLRX_EXACT_WINDOW_RULE{ETLRXWindowBorder::kNull, 2, CTLRX_WINDOW_MAX_SIZE,
                                              CTLRX_ERR_ARGUMENTS};

// Raises theRule's code (no message) unless both sizes lie in its limits.
void fdfCheckWindowSize(int32_t theRows, int32_t theCols, const SWindowRule &theRule = CTLRX_CLIPPED_WINDOW_RULE);

// Whether the line read delivers intensities for a raster of this header:
// "DataUnits" "POWER", or a complex cell type (whose cells are read as
// re^2 + im^2 whatever the data units say).
bool fdfDeliversIntensity(const CDescription &theHeader);

// One input raster of a window step: its header (missing: 261122 with the
// header name), size and whether it delivers intensities, then the open raster
// and a band of lines of values with their validity flags. A complex input
// asked for its parts gives the cells themselves instead of their intensities.
class CWindowInput {
public:
  explicit CWindowInput(const char *theName);

  // Complex cells read as parts (cells()) rather than intensities (values());
  // no effect on real cells. Before open().
  void readParts();
  // Opens the raster for reading (after every header check of the step).
  void open();
  // Band buffers for theLines lines (after open()).
  void reserveLines(int32_t theLines);
  // Holds lines theFirst .. theFirst + theCount - 1 in the band buffers:
  // values() (or cells()) and mask() (1 valid, 0 no data; a complex cell is
  // no data when both its parts are). A line sits in row line % rows, so the
  // lines the band held already stay where they are and are not read again.
  // A band longer than the buffers makes them grow (every line read again).
  void readBand(int32_t theFirst, int32_t theCount);
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
  bool readsParts() const { return mParts; }
  // Line theLine of the band held; a line outside it is a fault of the
  // caller and raises 913920 naming it.
  const double *values(int32_t theLine) const { return &mValues[row(theLine)]; }
  const std::complex<double> *cells(int32_t theLine) const { return &mCells[row(theLine)]; }
  const int32_t *mask(int32_t theLine) const { return &mMask[row(theLine)]; }

private:
  size_t row(int32_t theLine) const;
  void readRow(int32_t theLine, size_t theRow);

  std::string mName;
  CDescription mHeader;
  int32_t mLines = 0;
  int32_t mPixels = 0;
  bool mIntensity = false;
  bool mParts = false;
  CRasterFile mRaster;
  int32_t mRows = 0;
  int32_t mBandFirst = 0;
  int32_t mBandCount = 0;
  std::vector<double> mValues;
  std::vector<std::complex<double>> mCells;
  std::vector<uint8_t> mValid;
  std::vector<int32_t> mMask;
};

// theOther must have theFirst's lines and pixels: traces "Error: The number of
// lines does not match (" (or "pixels per line") with both counts and raises
// 652807 without a message.
void fdfCheckSameSize(const CWindowInput &theFirst, const CWindowInput &theOther);

// fdfMakeResultHeader with cells "FLOAT".
void fdfMakeWindowResultHeader(CDescription &theResult, const CDescription &theInput, double theNull,
                               const char *theUnits);

// fdfStampPairHeaders of the two inputs.
void fdfStampPairInputs(CDescription &theResult, const CWindowInput &theFirst, const CWindowInput &theSecond);

// Usage text of the two-input steps to the trace, after their argument
// count and arguments; theWithNorm adds the normalisation image line.
void fdfTracePairStepUsage(int theArgc, char **theArgv, bool theWithNorm);

// "Number of significant value (no equal to <null> one) = <count>" to the trace.
void fdfTraceSignificantCount(double theNull, int64_t theCount);

// How a window step starts: the banner traced first, the number of arguments
// it needs after the program name, the usage traced and the code raised
// (without a message) when fewer are given, and its window rule.
struct SWindowStepSyntax {
  const char *mBanner;
  int mArguments;
  void (*mUsage)(int theArgc, char **theArgv);
  int32_t mMissingCode;
  SWindowRule mRule;
};

// Fills the terms and centre flags of input line theLine from the inputs'
// band buffers (values(theLine), mask(theLine)). Runs on the worker threads.
using TLRXWindowTerms = std::function<void(int32_t theLine, double *const *theTerms, uint8_t *theCentre)>;
// Turns the window sums and centre flags of a line into an output line, on
// worker thread theThread (< CWindowStep::threads(): per-thread counters).
using TLRXWindowValues =
    std::function<void(int theThread, const double *const *theSums, const uint8_t *theCentre, float *theOut)>;

// A count kept by one worker thread, alone on its cache line so the threads
// do not slow each other; the calling thread adds them up after the run.
template <class T> struct alignas(64) SThreadCounter {
  T mValue{};
};

// One run of a window step: arguments, window, inputs, the line loop.
class CWindowStep {
public:
  // Traces the banner; with fewer arguments than the syntax needs, traces its
  // usage and raises its code.
  CWindowStep(int theArgc, char **theArgv, const SWindowStepSyntax &theSyntax);

  // Window size argument theIndex, read whole: anything but an integer
  // raises the rule's code with "theWhat: not an integer [token]".
  int32_t windowArgument(int theIndex, const char *theWhat) const;
  // Real argument theIndex, read whole and finite (theCode otherwise).
  double realArgument(int theIndex, const char *theWhat, int32_t theCode) const;
  // The window of the run, checked against the rule's limits.
  void setWindow(int32_t theRows, int32_t theCols);

  // The rasters named by the arguments theIndices as inputs, in that order:
  // every header is read (missing: 261122), then each must have the first
  // one's size (652807).
  void addInputs(std::initializer_list<int> theIndices);
  CWindowInput &input(size_t theIndex) { return *mInputs[theIndex]; }
  // Opens every input raster, after the step's header checks.
  void openInputs();

  // Threads of the run (fdfThreadCount).
  int threads() const;
  // The line loop over the first input's lines, in bands: the inputs read a
  // band of lines on the calling thread, the band's blocks run in parallel
  // (theTerms of each input line, theValues of each output line), then the
  // band's output lines are written to theOutput in order. Progress 2 .. 99
  // for every line in order on the calling thread as its band is read (the
  // host's interruption stops the run there); the inputs are closed at the
  // end. Results do not depend on the number of threads.
  void runLines(CResultRaster &theOutput, int theChannels, const TLRXWindowTerms &theTerms,
                const TLRXWindowValues &theValues);
  // Traces "writing the output parameter file <name>" and commits the
  // result with its header (failure: 261123 with the header name).
  void commit(CResultRaster &theOutput, CDescription &theHeader);

private:
  int mArgc;
  char **mArgv;
  SWindowRule mRule;
  SWindowShape mShape;
  std::vector<std::unique_ptr<CWindowInput>> mInputs;
};
