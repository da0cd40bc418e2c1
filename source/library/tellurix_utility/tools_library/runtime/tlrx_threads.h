// Threads within a run. Work is cut into pieces whose bounds are absolute
// (line and column positions fixed by the data, never by the thread count),
// so any number of threads gives the results of one, bit for bit. Only the
// calling thread reads, writes, traces and reports progress; the pieces run
// in parallel compute into buffers of their own.
#pragma once

#include <cstdint>
#include <functional>
#include <vector>

// Upper bound of TELLURIX_THREADS.
constexpr int CTLRX_MAX_THREADS = 256;

// Threads of the run: TELLURIX_THREADS when set, else the CPUs the process
// may use (affinity and control-group quota). Read once; a value that is not
// an integer from 1 to CTLRX_MAX_THREADS raises 783360 naming the variable.
int fdfThreadCount();
// Forgets the count read, so the next call reads the variable again (tests).
void fdfResetThreadCount();

// Calls theBody(i, t) once for every i in [0, theCount), spread over the
// run's threads; t < fdfThreadCount() names the thread, for per-thread
// buffers. Returns when every call has ended. When calls throw, the calls of
// higher index that had not started are skipped and the exception of the
// lowest index is rethrown here, as one thread would have.
using TLRXPieceBody = std::function<void(int64_t theIndex, int theThread)>;
void fdfParallelFor(int64_t theCount, const TLRXPieceBody &theBody);

// Lines [theFirst, theFirst + theCount) of an image.
using TLRXLineRange = std::function<void(int32_t theFirst, int32_t theCount)>;
// The same, computed on thread theThread.
using TLRXLineBlock = std::function<void(int32_t theFirst, int32_t theCount, int theThread)>;

// An image of mLines lines streamed in bands of mBand lines, each cut into
// blocks of mBlock lines (mBand a multiple of mBlock; both start at multiples
// of their size, counted from line 0).
struct SLineBands {
  int32_t mLines = 0;
  int32_t mBlock = 1;
  int32_t mBand = 1;
};

// Bands of theBlocksPerThread blocks of theBlock lines per thread, for
// theLines lines; the block size alone fixes the results, the band only how
// many lines are held at once.
SLineBands fdfLineBands(int32_t theLines, int32_t theBlock, int32_t theBlocksPerThread = 2);

// For each band in order: theRead(first, count) on the calling thread, then
// theCompute on every block of the band in parallel, then theWrite(first,
// count) on the calling thread. The band's first line is theFirst - the
// band's index times mBand is its slot in the caller's buffers.
void fdfRunLineBands(const SLineBands &theBands, const TLRXLineRange &theRead, const TLRXLineBlock &theCompute,
                     const TLRXLineRange &theWrite);

// The lines of the band in hand for one raster or result: line l of the
// image at (l - first) * pixels. Workers write disjoint lines.
template <typename T>
class CBandLines {
public:
  CBandLines(const SLineBands &theBands, int32_t thePixels)
      : mPixels(static_cast<size_t>(thePixels)), mValues(static_cast<size_t>(theBands.mBand) * mPixels) {}
  void start(int32_t theFirst) { mFirst = theFirst; }
  T *line(int32_t theLine) { return &mValues[static_cast<size_t>(theLine - mFirst) * mPixels]; }

private:
  size_t mPixels;
  std::vector<T> mValues;
  int32_t mFirst = 0;
};
