// Moving-window sums shared by the window steps (texture, normalisation,
// intensity correlation, and any later step on a moving window): row-window
// running sums per input line, a ring of R line slots, column accumulators
// over the vertical window, and the line schedule that streams an image
// through them with a few lines in memory.
//
// Windows of output pixel (l, j) for R rows and K columns, hr = R / 2 and
// hc = K / 2, in an image of L lines of P pixels, by border rule:
//   clipped: columns j - hc .. j + hc (2 hc + 1 wide: K + 1 when K is even),
//            lines l + hr - R + 1 .. l + hr (R lines, centred when R is odd),
//            both clipped to the image, never padded or mirrored; every pixel
//            is computed, an image smaller than the window included.
//   exact:   columns j - hc .. j - hc + K - 1, lines l - hr .. l - hr + R - 1
//            (exactly R x K, centred when odd). The first and last hr lines
//            and hc columns are border: their centre flags are cleared, so
//            the measures write the null value there (an image smaller than
//            the window is all border).
//
// Each measure turns an input line into "terms" (one array of P doubles per
// channel, 0 where the pixel does not count) and the centre flags of the
// line's own pixels (1: the output pixel is computed); the machinery sums the
// terms over the window and never looks at no-data values itself. A measure
// must write the null value wherever the centre flag is 0.
//
// Exactness: beside every sum the number of non-zero terms in its window is
// kept as an integer, and a window with none sums to exactly 0 (a block of
// zeros after bright pixels gives 0, not a residue of the bright values).
// Counts of valid pixels are channels of terms 1 and 0, exact in double up to
// 2^53. Running sums are recomputed from the stored terms at the columns that
// are multiples of the window width and at the output lines that are
// multiples of R, so rounding residue (a 1e20 spike among ones) never outlives
// one window, and results depend on absolute positions only, not on where a
// block of lines or columns starts. The cost per pixel stays independent of
// the window size (one recomputation of cost K per K columns, of R line slots
// per R lines). Sums are double precision.
//
// Threads: a run of output lines that starts at a multiple of R needs nothing
// from the lines before it but the input lines its first window holds, so
// blocks of lines starting at multiples of R can run on rings of their own and
// give, bit for bit, what one ring running from line 0 gives. The band runner
// below streams an image so: bands of lines read and written by the caller,
// blocks of a band computed in parallel.
#pragma once

#include "tlrx_line_bands.h"

#include <cstdint>
#include <functional>
#include <memory>
#include <vector>

// How the window meets the image edges (see above).
enum class ETLRXWindowBorder {
  kClipped,
  kNull,
};

// Window of R rows and K columns with its border rule.
struct SWindowShape {
  int32_t mRows = 3;
  int32_t mCols = 3;
  ETLRXWindowBorder mBorder = ETLRXWindowBorder::kClipped;

  // Columns left of j in the window, and the window width.
  int32_t left() const { return mCols / 2; }
  int32_t width() const { return mBorder == ETLRXWindowBorder::kClipped ? 2 * (mCols / 2) + 1 : mCols; }
  // Lines after l in the window (the window holds mRows lines).
  int32_t below() const { return mBorder == ETLRXWindowBorder::kClipped ? mRows / 2 : mRows - 1 - mRows / 2; }
};

// Row-window sum of one line: theSums[j] = sum of theTerms[k] and
// theNonZero[j] = number of non-zero theTerms[k] for k in the window
// j - theLeft .. j - theLeft + theWidth - 1 clipped to 0 .. thePixels - 1;
// theSums[j] is exactly 0 where theNonZero[j] is 0. Running sums, recomputed
// directly at the columns that are multiples of theWidth.
void fdfRowWindowSum(const double *theTerms, int32_t thePixels, int32_t theLeft, int32_t theWidth, double *theSums,
                     int32_t *theNonZero);

// Fills the ring's scratch terms and the centre flags of input line theLine.
using TLRXWindowLoad = std::function<void(int32_t theLine)>;
// Produces output line theLine from the accumulators and its centre flags.
using TLRXWindowEmit = std::function<void(int32_t theLine)>;

class CWindowRing;
// The line schedule (below); it keeps its place in the ring.
void fdfRunWindowLines(CWindowRing &theRing, int32_t theFirst, int32_t theEnd, const TLRXWindowLoad &theLoad,
                       const TLRXWindowEmit &theEmit);

// R line slots of row-window sums, the column accumulators over the lines
// currently in the window, and the scratch line the measure fills before a
// line is stored. Memory: (R + 2) x channels x P doubles, (R + 1) x channels
// x P counts and R x P flags.
class CWindowRing {
public:
  CWindowRing(const SWindowShape &theShape, int32_t theLines, int32_t thePixels, int theChannels);
  // The channel arrays point into the ring itself.
  CWindowRing(const CWindowRing &) = delete;
  CWindowRing &operator=(const CWindowRing &) = delete;

  const SWindowShape &shape() const { return mShape; }
  int32_t lines() const { return mLines; }
  int32_t pixels() const { return static_cast<int32_t>(mPixels); }
  int channels() const { return mChannels; }

  // Scratch terms of channel theChannel for the line about to be stored.
  double *terms(int theChannel) { return &mTerms[static_cast<size_t>(theChannel) * mPixels]; }
  // The scratch terms of every channel, for the measures' term functions.
  const std::vector<double *> &termArrays() const { return mTermArrays; }
  // Centre flags (1 computed) of image line theLine (its slot).
  uint8_t *centre(int32_t theLine) { return &mCentre[slotIndex(theLine) * mPixels]; }
  // Row-window sums of the scratch terms into the slot of image line
  // theLine; clears the centre flags of its border pixels.
  void storeLine(int32_t theLine);
  // Adds (or removes) the sums of image line theLine to (from) the
  // accumulators.
  void addLine(int32_t theLine);
  void subtractLine(int32_t theLine);
  // Sets the accumulators to the sums of the slots of lines theFirst ..
  // theLast, added in line order.
  void recompute(int32_t theFirst, int32_t theLast);
  // Accumulator of channel theChannel: the window sums of the added lines.
  const double *column(int theChannel) const { return &mColumns[static_cast<size_t>(theChannel) * mPixels]; }
  // The accumulators of every channel, for the measures' line functions.
  const std::vector<const double *> &columnArrays() const { return mColumnArrays; }

  // Output line the ring would emit next when continuing (-1: none, after a
  // run that failed).
  int32_t nextLine() const { return mNextLine; }

private:
  friend void fdfRunWindowLines(CWindowRing &, int32_t, int32_t, const TLRXWindowLoad &, const TLRXWindowEmit &);

  size_t slotIndex(int32_t theLine) const { return static_cast<size_t>(theLine % mShape.mRows); }
  size_t slotOffset(int32_t theLine, int theChannel) const {
    return (slotIndex(theLine) * mChannels + theChannel) * mPixels;
  }
  void addSlot(int32_t theLine, int theSign);
  void clearBorder(int32_t theLine);

  SWindowShape mShape;
  int32_t mLines;
  size_t mPixels;
  int mChannels;
  std::vector<double> mSlots;
  std::vector<int32_t> mSlotNonZero;
  std::vector<uint8_t> mCentre;
  std::vector<double> mColumns;
  std::vector<int32_t> mColumnNonZero;
  std::vector<double> mTerms;
  std::vector<double *> mTermArrays;
  std::vector<const double *> mColumnArrays;
  // Where the schedule stands: the next output line and the next input line
  // to load.
  int32_t mNextLine = 0;
  int32_t mNextLoad = 0;
};

// The line schedule over output lines theFirst .. theEnd - 1: for output line
// l, the line that left the window is subtracted, the lines that entered it
// are loaded into the slots just freed and added (at lines that are multiples
// of R the accumulators are recomputed from the slots instead), and line l is
// emitted. A run continues where the ring's last run ended (theFirst ==
// nextLine()) or starts afresh at a multiple of R, loading first the lines
// the window of theFirst holds; either way every line comes out as in one run
// from line 0. Any other start, or a range outside 0 .. lines(), throws
// std::invalid_argument. Input lines are loaded once each, in order.
void fdfRunWindowLines(CWindowRing &theRing, int32_t theFirst, int32_t theEnd, const TLRXWindowLoad &theLoad,
                       const TLRXWindowEmit &theEmit);
// The whole image from line 0 on a fresh ring.
inline void fdfRunWindowSchedule(CWindowRing &theRing, const TLRXWindowLoad &theLoad, const TLRXWindowEmit &theEmit) {
  fdfRunWindowLines(theRing, 0, theRing.lines(), theLoad, theEmit);
}

// ------------------------------------------------------------ window bands
// Lines of a window block: a multiple of R (so every block starts afresh at a
// recomputation line) of at least 4 R and about 64 lines, so the R - 1 lines
// a block that starts afresh loads again stay a small part of its work (at
// most a quarter; 6 in 70 lines for R = 7), while a band of one block per
// thread stays short.
int32_t fdfWindowBlockLines(const SWindowShape &theShape);

// Loads (or emits) line theLine on the ring of thread theThread.
using TLRXRingLine = std::function<void(CWindowRing &theRing, int32_t theLine, int theThread)>;

// The window schedule over an image streamed in bands: for each band the
// caller reads the band's input lines into its band buffers (theRead), the
// blocks of the band run in parallel, each on the ring of its thread
// (theLoad fills the ring's terms of an input line from the band buffers,
// theEmit turns the ring's sums into an output line of the caller's band
// output), then the caller writes the band's output lines (theWrite). One
// ring per thread, made when the thread first needs it; a block that follows
// on its ring's last one continues without loading its window again. One
// thread runs the image as one block on one ring, read in bands of R lines.
// Results do not depend on theThreads.
class CWindowBands {
public:
  CWindowBands(const SWindowShape &theShape, int32_t theLines, int32_t thePixels, int theChannels, int theThreads,
               TLRXParallelFor theParallelFor);

  const SBandPlan &plan() const { return mPlan; }
  void run(const TLRXBandStep &theRead, const TLRXRingLine &theLoad, const TLRXRingLine &theEmit,
           const TLRXBandStep &theWrite);

private:
  SWindowShape mShape;
  int32_t mPixels;
  int mChannels;
  SBandPlan mPlan;
  TLRXParallelFor mParallelFor;
  std::vector<std::unique_ptr<CWindowRing>> mRings;
};
