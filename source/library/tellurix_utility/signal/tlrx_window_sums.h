// Moving-window sums shared by the texture, normalisation and intensity
// correlation steps: row-window running sums per input line, a ring of R line
// slots, column accumulators over the vertical window, and the line schedule
// that streams an image through them with a few lines in memory.
//
// Window of output pixel (l, j) for R rows and K columns, hr = R / 2 and
// hc = K / 2, in an image of L lines of P pixels:
//   columns max(0, j - hc) .. min(P - 1, j + hc)   (2 hc + 1 wide: K + 1 when K is even)
//   lines   max(0, l + hr - R + 1) .. min(L - 1, l + hr)
//                                                 (R lines, centred when R is odd)
// Windows are clipped at the image edges, never padded or mirrored. An image
// with fewer lines or pixels than the window is computed with the clipped
// windows, so every output pixel sees the whole image in that direction.
//
// Each measure turns an input line into "terms" (one array of P doubles per
// channel, 0 where the pixel does not count) and the validity flags of the
// line's own pixels; the machinery sums the terms over the window, so it never
// looks at no-data values itself. Sums are double precision; counts are kept
// as doubles too (exact up to 2^53).
#pragma once

#include <cstdint>
#include <functional>
#include <vector>

// Row-window sum of one line: theSums[j] = sum of theTerms[k] for k in
// max(0, j - theHalf) .. min(thePixels - 1, j + theHalf). Running sum: one
// term enters and one leaves per column, so the cost does not depend on
// theHalf. Column 0 is summed like every other column.
void fdfRowWindowSum(const double *theTerms, int32_t thePixels, int32_t theHalf, double *theSums);

// R line slots of row-window sums, the column accumulators over the lines
// currently added, and the scratch line the measure fills before a line is
// stored. Memory: (R + 2) x channels x P doubles and R x P flags.
class CWindowRing {
public:
  CWindowRing(int32_t theRows, int32_t theCols, int32_t thePixels, int theChannels);

  int32_t rows() const { return mRows; }
  int32_t halfRows() const { return mRows / 2; }
  int32_t halfCols() const { return mCols / 2; }
  int32_t pixels() const { return mPixels; }
  int channels() const { return mChannels; }

  // Scratch terms of channel theChannel for the line about to be stored.
  double *terms(int theChannel) { return &mTerms[static_cast<size_t>(theChannel) * mPixels]; }
  // Validity flags (1 valid) of the pixels of image line theLine (its slot).
  uint8_t *centre(int32_t theLine) { return &mCentre[slotIndex(theLine) * mPixels]; }
  // Row-window sums of the scratch terms into the slot of image line theLine.
  void storeLine(int32_t theLine);
  // Adds (or removes) the sums of image line theLine to (from) the accumulators.
  void addLine(int32_t theLine);
  void subtractLine(int32_t theLine);
  // Accumulator of channel theChannel: the window sums of the added lines.
  const double *column(int theChannel) const { return &mColumns[static_cast<size_t>(theChannel) * mPixels]; }

private:
  size_t slotIndex(int32_t theLine) const { return static_cast<size_t>(theLine % mRows); }
  double *slot(int32_t theLine, int theChannel) {
    return &mSlots[(slotIndex(theLine) * mChannels + theChannel) * mPixels];
  }

  int32_t mRows;
  int32_t mCols;
  size_t mPixels;
  int mChannels;
  std::vector<double> mSlots;
  std::vector<uint8_t> mCentre;
  std::vector<double> mColumns;
  std::vector<double> mTerms;
};

// Fills the ring's scratch terms and the centre flags of input line theLine.
using TLRXWindowLoad = std::function<void(int32_t theLine)>;
// Produces output line theLine from the accumulators and its centre flags.
using TLRXWindowEmit = std::function<void(int32_t theLine)>;
// Told output line theLine of theLines is next (progress, interruption).
using TLRXWindowProgress = std::function<void(int32_t theLine, int32_t theLines)>;

// The line schedule: for output line l = 0 .. theLines - 1, the line that
// left the window (l + hr - R) is subtracted, the lines that entered it (up to
// min(theLines - 1, l + hr)) are loaded into the slot just freed and added,
// and line l is emitted. Every input line is loaded once, in order. Progress
// (when given) is told before each output line.
void fdfRunWindowSchedule(CWindowRing &theRing, int32_t theLines, const TLRXWindowLoad &theLoad,
                          const TLRXWindowEmit &theEmit, const TLRXWindowProgress &theProgress = nullptr);
