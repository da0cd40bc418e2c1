// Fringe-adaptive filter of an interferogram, streaming line by line.
//
// Patches of 32 x 32 cells start every 16 lines and 16 columns from -16, so
// four patches cover every cell. Each patch is transformed (2-D FFT); the
// strongest bin and the 4 x 4 bins around it (extended towards the stronger
// neighbour in each axis) hold P_peak, the whole patch P_noise, and
//   SNR = (P_peak - P_noise 16 / 1024) / P_noise,
// about g^2 for a single-look fringe of coherence g, about 0.004 for noise.
// With SNR >= the low-SNR threshold the pass band is centred on the peak bin
// (the local fringe), else on zero frequency. The pass band is separable,
//   H(d) = sinc(w d / 32) kaiser(d)   (d = -16..15 bins from its centre),
// the spectrum of a boxcar of w pixels (w / 32 cycles per pixel per bin)
// tapered by a Kaiser window of beta 2.1 across the patch band, unit gain at
// its centre; width 0 passes every frequency unchanged. The filtered patch
// is added back with separable weights sin^2(pi (n + 0.5) / 32), which sum to
// 1 over the two patches covering a cell in each axis.
//
// Borders: cells outside the image count as 0 + 0i in the patches; the
// weights still sum to 1. No data: a cell that is 0 + 0i (or not finite) in
// the input counts as 0 + 0i and is exactly 0 + 0i in the output.
//
// Memory: 16 (rows + 1) input lines, 16 (rows + 2) accumulator lines and the
// filtered patches of the rows of patches filtered together, whatever the
// height; the result depends only on absolute cell positions. The patches of
// those rows are filtered in parallel and added back row after row in column
// order, so neither the thread count nor the rows change a byte.
#pragma once

#include <array>
#include <complex>
#include <cstdint>
#include <vector>

#include "tlrx_fft.h"

constexpr int32_t CTLRX_FRINGE_PATCH = 32;
constexpr int32_t CTLRX_FRINGE_STEP = 16;

// What the patches of a run were.
struct SFringeFilterStats {
  int64_t mPatches = 0;        // patches holding any non-zero cell
  int64_t mAboveThreshold = 0; // of those, filtered around their peak
  double mSnrSum = 0.0;        // sum of their SNR (each at most 1e30)
};

class CFringeFilter {
public:
  // thePixels per line (at least 1), the low-SNR threshold, the width w in
  // pixels (0 or more) and the rows of patches filtered together (1 to 64):
  // lines come out theRows x 16 at a time.
  CFringeFilter(int32_t thePixels, double theLowSnr, double theWidth, int32_t theRows = 1);

  // Line y (in order from 0) of thePixels cells; returns how many filtered
  // lines are ready. Every ready line must be taken by popLine before the
  // next pushLine or finish (std::logic_error otherwise).
  int32_t pushLine(const std::complex<float> *theLine);
  // Ends the image after the lines pushed; returns how many lines are ready
  // (the last ones). Further pushes are refused.
  int32_t finish();
  // The next filtered line, in order, into thePixels cells.
  void popLine(std::complex<float> *theLine);

  const SFringeFilterStats &stats() const { return mStats; }
  // The pass band gain H(d) at a signed bin offset d from its centre.
  double passBand(int32_t theOffset) const;

private:
  // What one patch found: whether it held data, its SNR and pass band.
  struct SPatchResult {
    bool mAny = false;
    bool mAtPeak = false;
    double mSnr = 0.0;
  };

  void processBands(int32_t theStart, int32_t theRows);
  // Patch (theRow, theCol) filtered and weighted into thePatch (32 x 32).
  void filterPatch(int32_t theRow, int32_t theCol, std::complex<float> *thePatch, float *thePower,
                   SPatchResult &theResult) const;
  const std::complex<float> *inputLine(int32_t theLine) const;
  std::complex<float> *inputLine(int32_t theLine);
  std::complex<float> *sumLine(int32_t theLine);
  void requireTaken() const;

  int32_t mPixels;
  double mLowSnr;
  int32_t mRows;       // patch rows filtered together
  int32_t mInputLines; // lines of the input ring
  int32_t mSumLines;   // lines of the accumulator ring
  int32_t mColumns = 0; // patches per row
  std::array<float, CTLRX_FRINGE_PATCH> mPassBand; // by offset mod 32, 1 / 32 folded in
  std::array<float, CTLRX_FRINGE_PATCH> mWeight;
  std::vector<std::complex<float>> mInput; // ring by line
  std::vector<std::complex<float>> mSum;   // ring by line
  std::vector<std::vector<float>> mPower;     // per thread, one patch
  CFftBuffer mPatches;                        // the patches of the rows
  std::vector<SPatchResult> mPatchResults;
  const CFftPlan2D &mForward;
  const CFftPlan2D &mInverse;
  int32_t mPushed = 0;    // lines received
  int32_t mFinal = 0;     // lines [0, mFinal) are filtered
  int32_t mNextOut = 0;   // next line popLine gives
  int32_t mNextBand = -CTLRX_FRINGE_STEP;
  bool mFinished = false;
  SFringeFilterStats mStats;
};

// Step program: 1 interferogram (FLOAT_COMPLEX), 2 filtered result, 3 low-SNR
// threshold, 4 width in pixels (above 0).
int tlrx_fringe_filter(int argc, char **argv);
