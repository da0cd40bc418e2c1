// Interpolation of band-limited complex samples with a Knab-windowed sinc of
// CTLRX_SINC_TAPS taps, tabulated at CTLRX_SINC_STEPS fractional positions.
//
// k(x) = sinc(x) cosh(pi v L/2 sqrt(1 - (2x/L)^2)) / cosh(pi v L/2), |x| < L/2,
// L the tap count and v = 1 - 1 / osr, osr the sampling rate over the
// bandwidth. A value at position p (sample j at j) is sum_k w_k s(j0 - 3 + k),
// j0 = floor(p), the weights of the row nearest p - j0, each row normalised to
// unit sum so that a constant is kept exactly and no gain ripple follows the
// fractional shift.
#pragma once

#include <algorithm>
#include <cmath>
#include <complex>
#include <cstdint>
#include <vector>

constexpr int32_t CTLRX_SINC_TAPS = 8;
constexpr int32_t CTLRX_SINC_STEPS = 2048;
// Taps before the sample at floor(p): j0 - CTLRX_SINC_BEFORE .. j0 + 4.
constexpr int32_t CTLRX_SINC_BEFORE = CTLRX_SINC_TAPS / 2 - 1;

class CSincTable {
public:
  // theOversampling: sampling rate over bandwidth (1.2 for usual SLCs); values
  // at or below 1 give v = 0 (a plain truncated sinc).
  explicit CSincTable(double theOversampling = 1.2);
  // The CTLRX_SINC_TAPS weights for a fraction in [0, 1): row
  // round(fraction x CTLRX_SINC_STEPS); the row at 1 is the row of 0 moved by
  // one sample, so callers pass floor and fraction from fdfSplitPosition.
  const float *weights(double theFraction) const {
    return mRows.data() + static_cast<size_t>(rowOf(theFraction)) * CTLRX_SINC_TAPS;
  }
  // Unit-test access to the kernel itself.
  static double knab(double theX, double theV);

  // Row of a fraction in [0, 1] (nearest, halves up), clamped; a NaN gives
  // row 0.
  static int32_t rowOf(double theFraction) {
    const double aRow = theFraction * CTLRX_SINC_STEPS + 0.5;
    return aRow >= 1.0 ? static_cast<int32_t>(std::min(aRow, double(CTLRX_SINC_STEPS))) : 0;
  }

private:
  std::vector<float> mRows; // (CTLRX_SINC_STEPS + 1) x CTLRX_SINC_TAPS
};

// p = first + fraction with fraction in [0, 1) after rounding to the table's
// step (a fraction that rounds to 1 moves to the next sample).
// Inline: it runs once per resampled value.
inline void fdfSplitPosition(double thePosition, int64_t &theFirst, double &theFraction) {
  const double aFloor = std::floor(thePosition);
  int32_t aRow = CSincTable::rowOf(thePosition - aFloor);
  theFirst = static_cast<int64_t>(aFloor);
  if (aRow == CTLRX_SINC_STEPS) {
    ++theFirst;
    aRow = 0;
  }
  theFraction = double(aRow) / CTLRX_SINC_STEPS;
}

// Interpolates theIn (theCount samples, sample j at j) at thePositions
// (theOutCount of them) into theOut. Taps outside 0 .. theCount - 1 count as
// 0; a position outside [0, theCount - 1] gives 0 + 0i.
void fdfSincResampleLine(const CSincTable &theTable, const std::complex<float> *theIn, int32_t theCount,
                         const double *thePositions, int32_t theOutCount, std::complex<float> *theOut);
