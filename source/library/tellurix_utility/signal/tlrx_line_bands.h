// Images streamed in bands of lines, the blocks of a band computed in
// parallel: the plan, the runner and a band's line buffer. Bands and blocks
// start at multiples of their length counted from line 0, so where a block
// starts never depends on the thread count. The parallel loop is the
// caller's (fdfParallelFor of the runtime), so this library uses no other.
#pragma once

#include <algorithm>
#include <cstdint>
#include <functional>
#include <vector>

// A parallel loop: theBody(i, t) once for every i in [0, theCount), t < the
// number of threads naming the thread (callers pass fdfParallelFor).
using TLRXBlockBody = std::function<void(int64_t theIndex, int theThread)>;
using TLRXParallelFor = std::function<void(int64_t theCount, const TLRXBlockBody &theBody)>;

// Output lines mFirst .. mFirst + mCount - 1 of a band and the input lines
// mInFirst .. mInFirst + mInCount - 1 their values need.
struct SLineBand {
  int32_t mFirst = 0;
  int32_t mCount = 0;
  int32_t mInFirst = 0;
  int32_t mInCount = 0;
};

// How an image of mLines lines (input and output alike) is streamed: bands of
// mBand lines, each cut into blocks of mBlock lines, both starting at
// multiples of their length counted from line 0; an output line needs the
// input lines mAbove above it to mBelow below it (clipped to the image).
// mBlock is the grain of the parallel work, mBand how many lines are held;
// no caller's results may depend on the band.
struct SBandPlan {
  int32_t mLines = 0;
  int32_t mBlock = 1;
  int32_t mBand = 1;
  int32_t mAbove = 0;
  int32_t mBelow = 0;
  // Input lines a band can need: what a band buffer must hold.
  int32_t bandInputLines() const { return mBand + mAbove + mBelow; }
};

// A plan of blocks of theBlock lines, theBlocksPerThread blocks per thread in
// a band (the band no longer than the image rounded up to whole blocks).
SBandPlan fdfBandPlan(int32_t theLines, int32_t theBlock, int theThreads, int theBlocksPerThread, int32_t theAbove,
                      int32_t theBelow);

// Line-local work (an output line needs only its own input lines): two
// blocks of theBlock lines per thread in a band.
inline SBandPlan fdfLineBandPlan(int32_t theLines, int32_t theBlock, int theThreads) {
  return fdfBandPlan(theLines, theBlock, theThreads, 2, 0, 0);
}

// A band's input lines on the calling thread (read), or its output lines
// (write).
using TLRXBandStep = std::function<void(const SLineBand &theBand)>;
// Output lines theFirst .. theFirst + theCount - 1 computed on thread theThread.
using TLRXBlockStep = std::function<void(int32_t theFirst, int32_t theCount, int theThread)>;

// For each band in order: theRead on the calling thread, theCompute on the
// band's blocks in parallel, then theWrite on the calling thread. An
// exception of a block is rethrown here (the parallel loop's rule), before
// the band is written.
void fdfRunBands(const SBandPlan &thePlan, const TLRXParallelFor &theParallelFor, const TLRXBandStep &theRead,
                 const TLRXBlockStep &theCompute, const TLRXBandStep &theWrite);

// The lines of the band in hand for one raster or result, for bands of
// theBandLines lines that start at multiples of theBandLines (as the runner's
// do): line l of the image at (l mod theBandLines) * pixels. Blocks write
// disjoint lines.
template <typename T>
class CBandLines {
public:
  CBandLines(int32_t theBandLines, int32_t thePixels)
      : mBand(std::max(1, theBandLines)), mPixels(static_cast<size_t>(thePixels)),
        mValues(static_cast<size_t>(mBand) * mPixels) {}
  T *line(int32_t theLine) { return &mValues[static_cast<size_t>(theLine % mBand) * mPixels]; }

private:
  int32_t mBand;
  size_t mPixels;
  std::vector<T> mValues;
};
