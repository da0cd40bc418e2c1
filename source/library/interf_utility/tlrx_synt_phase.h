// Synthetic (reference) phase, a step of the coherence chain: R + "_sint",
// the phase in radians that the flattening removes from R + "_int". There is
// no orbit or geometry here, so the phase is estimated from the
// interferogram's own fringes, with an optional elevation-model term:
//   phi(x, y) = 2 pi P(u, v) + k h(x, y) + c
// P a polynomial without constant term of degree 3 at most in the
// coordinates u, v normalised to [-1, 1] across the image, h the height on
// the interferogram's grid, k and c fitted. The phase is unwrapped.
//
// Pass 1 tiles the interferogram into blocks of Ba x Br cells (64 each, the
// image side when smaller; a last partial block row or column is kept when
// at least half a block; blocks under 8 x 8 give no estimate) and measures
// each block (SSyntBlock): at least half its cells valid (not 0 + 0i, finite),
// a significant spectral peak (see fdfSyntSnrThreshold), its frequencies
// refined below the bin (twice: the phase of one half's demodulated sum
// against the other's, a lag of half a block, unambiguous within a bin and
// about 25 times less noisy than neighbouring cells' products at g 0.6), the
// block's complex sum demodulated to its centre
// and, with an elevation model, the least-squares height plane of its known
// heights. The fit (fdfFitSyntPhase) solves the gradient equations
//   dP/dx + k/(2 pi) dh/dx = fr,  dP/dy + k/(2 pi) dh/dy = fa
// per kept block by weighted least squares, then c from the blocks' sums,
// each against the model's own curvature across its block (a curved fringe
// shifts the phase of a block's sum away from the phase at its centre).
// Pass 2 writes phi line by line. Memory: Ba interferogram lines (and their
// heights) and one record of about 100 bytes per kept 64 x 64 block.
//
// Elevation model: any real raster on the master grid, multilooked to the
// interferogram's grid (fdfHeightLooks). A cell whose height is unknown (a
// null or NaN height in its box) gets 2 pi P + c only: the height term is
// left out there rather than guessed.
//
// Arguments (argv[0] the program, 23 more as the chain passes them): 1 the
// master power image (its size must be the interferogram's), 4 the elevation
// model ("NotOK" or empty for none; any other name must be a raster with its
// header, not silently skipped), 9 the output root R; the interferogram is
// R + "_int".
// The numbers 6, 7, 8 (integers) and 14 (a real) are checked and logged as
// not used, like every other argument.
#pragma once

#include <array>
#include <complex>
#include <cstdint>
#include <vector>

#include "tlrx_fft.h"
#include "tlrx_no_data.h"

constexpr int32_t CTLRX_SYNT_BLOCK = 64;     // block side, cells
constexpr int32_t CTLRX_SYNT_MIN_BLOCK = 8;  // smaller blocks give no estimate
constexpr int32_t CTLRX_SYNT_MAX_DEGREE = 3; // of the polynomial P
constexpr int32_t CTLRX_SYNT_TERMS = 9;      // u, v, u^2, uv, v^2, u^3, u^2 v, u v^2, v^3

// Significance of a block's peak: SNR = n P_peak / (P_total - P_peak), n the
// number of bins, P_peak the 2 x 2 bins of the strongest bin and its stronger
// neighbour in each axis (a fringe between bins splits its power over them).
// A block is kept when SNR exceeds the threshold at which white noise would
// pass with probability CTLRX_SYNT_FALSE_ALARM (fdfSyntSnrThreshold): 38.5
// for 64 x 64 blocks, where 20000 noise blocks peaked at 29 at most and a
// single-look fringe of coherence 0.3 midway between bins gave 102 at least.
constexpr double CTLRX_SYNT_FALSE_ALARM = 1e-9;

// The threshold for blocks of theBins bins: n P(Beta(4, n - 4) > T / (n + T))
// = CTLRX_SYNT_FALSE_ALARM, the share of 4 white-noise bins in the total.
double fdfSyntSnrThreshold(int32_t theBins);

// One kept block of pass 1.
struct SSyntBlock {
  double mX = 0.0, mY = 0.0;    // centre, cell coordinates (pixel, line)
  int32_t mCols = 0, mRows = 0; // extent, cells
  double mFr = 0.0, mFa = 0.0;  // fringe frequencies, cycles per cell (range, azimuth)
  double mWeightRange = 0.0;    // inverse variances (up to a common factor) of mFr
  double mWeightAzimuth = 0.0;  // and mFa
  std::complex<double> mSum;    // sum of z e^(-2 pi i (fr dx + fa dy)) about the centre
  double mSnr = 0.0;
  bool mHasHeight = false;      // at least half its heights known
  double mHeight = 0.0;         // height plane at the centre
  double mDhDx = 0.0, mDhDy = 0.0; // height gradients per cell
};

// The fitted phase and how it was found.
struct SSyntPhaseModel {
  int64_t mBlocks = 0;          // blocks examined
  int64_t mKept = 0;            // blocks that entered the fit
  int32_t mDegree = 0;          // 0: no fringe found, the phase is 0
  std::array<double, CTLRX_SYNT_TERMS> mCoefficients{}; // of P, cycles
  bool mHasHeight = false;      // the height term k is part of the model
  double mK = 0.0;              // radians per height unit
  double mC = 0.0;              // radians
  double mCentreX = 0.0, mScaleX = 1.0; // u = (x - centre) / scale
  double mCentreY = 0.0, mScaleY = 1.0;

  // P(u, v) in cycles at cell (x, y).
  double polynomial(double theX, double theY) const;
  // phi at one cell; the height term only where theKnown.
  double phase(double theX, double theY, double theHeight, bool theKnown) const;
  // phi along line theLine of thePixels cells (theHeights, theKnown may be
  // null: no height term), computed in double, stored as float.
  void line(int32_t theLine, int32_t thePixels, const double *theHeights, const uint8_t *theKnown,
            float *theOut) const;
};

// Pass 1: the interferogram (and the heights on its grid) line by line.
class CSyntBlockEstimator {
public:
  CSyntBlockEstimator(int32_t theLines, int32_t thePixels, bool theHeights);
  CSyntBlockEstimator(const CSyntBlockEstimator &) = delete;
  CSyntBlockEstimator &operator=(const CSyntBlockEstimator &) = delete;

  // The next line: thePixels cells (no data as 0 + 0i or not finite), and
  // with heights their values and 1 where known (ignored otherwise).
  void pushLine(const std::complex<float> *theCells, const double *theHeights, const uint8_t *theKnown);
  // After the last line: the last partial block row, when kept.
  void finish();

  const std::vector<SSyntBlock> &blocks() const { return mKept; }
  int64_t examined() const { return mExamined; }
  double threshold() const { return mThreshold; }

private:
  void measureRow(int32_t theRows);
  void measureBlock(int32_t theCol, int32_t theWidth, int32_t theRows);
  void heightPlane(int32_t theCol, int32_t theWidth, int32_t theRows, SSyntBlock &theBlock) const;

  int32_t mLines;
  int32_t mPixels;
  int32_t mBlockLines;
  int32_t mBlockPixels;
  bool mHeights;
  bool mActive; // blocks of at least 8 x 8
  double mThreshold;
  std::vector<std::complex<float>> mCells; // one block row, mBlockLines x mPixels
  std::vector<double> mHeightCells;
  std::vector<uint8_t> mKnown;
  int32_t mPushed = 0;
  int32_t mRowStart = 0;
  CFftBuffer mSpectrum;
  const CFftPlan2D *mPlan = nullptr;
  std::vector<float> mPower;
  std::vector<std::complex<double>> mRangePhasors;
  std::vector<std::complex<double>> mAzimuthPhasors;
  std::vector<SSyntBlock> mKept;
  int64_t mExamined = 0;
};

// The fit of the blocks for an image of theLines x thePixels. With
// theWithHeight only blocks with a height plane enter, and k with them; with
// fewer than 3 such blocks k is left out and every block enters. Degree: the
// highest of 1..3 whose unknowns (with k) are at most the kept blocks (twice
// as many gradient equations as unknowns); degree 1 from a single block.
// Unknowns the blocks cannot separate (a flat elevation model, one block
// row) are set to 0.
SSyntPhaseModel fdfFitSyntPhase(const std::vector<SSyntBlock> &theBlocks, int64_t theExamined, int32_t theLines,
                                int32_t thePixels, bool theWithHeight);

// How the elevation raster maps onto the interferogram's grid: mAzimuth
// lines per cell, and mRange pixels per cell averaged or, when
// mOversampling >= 2, pixel p / mOversampling taken.
struct SHeightLooks {
  int32_t mAzimuth = 1;
  int32_t mRange = 1;
  int32_t mOversampling = 1;
};
// False when an elevation raster of theDemLines x theDemPixels cannot cover
// an interferogram of theLines x thePixels at theAzimuthLooks x theRangeLooks.
bool fdfHeightLooks(int32_t theLines, int32_t thePixels, int32_t theDemLines, int32_t theDemPixels,
                    int32_t theAzimuthLooks, int32_t theRangeLooks, SHeightLooks &theLooks);
// One interferogram line of heights from theLooks.mAzimuth elevation lines
// (theRows, theDemPixels each, line after line): the mean of each box,
// unknown (theKnown 0, height 0) when any height in it is no data by theNull
// or NaN.
void fdfMultilookHeights(const double *theRows, int32_t theDemPixels, const SHeightLooks &theLooks,
                         const SNoData &theNull, int32_t thePixels, double *theHeights, uint8_t *theKnown);

int tlrx_split_synt_phase(int argc, char **argv);

// The closing operation removes nothing: the flattening needs the synthetic
// phase and removes it in its own closing. With fewer than 23 arguments (the
// program's name included) it traces that nothing is removed.
int tlrx_split_synt_phase_close(int argc, char **argv);
