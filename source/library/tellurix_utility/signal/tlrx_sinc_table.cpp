// Knab-windowed sinc table (see tlrx_sinc_table.h). Row r holds the weights
// of the taps j0 - 3 .. j0 + 4 for the fraction r / CTLRX_SINC_STEPS, tap k at
// distance x = fraction + 3 - k from the wanted position; the kernel is zero
// from |x| = L/2 on, so row CTLRX_SINC_STEPS is row 0 moved by one tap.
#include "tlrx_sinc_table.h"

#include <algorithm>
#include <cmath>

namespace {

constexpr double CTLRX_SINC_PI = 3.14159265358979323846;

} // namespace

double CSincTable::knab(double theX, double theV) {
  const double aHalf = 0.5 * CTLRX_SINC_TAPS;
  if (!(std::fabs(theX) < aHalf))
    return 0.0;
  const double aSinc = theX == 0.0 ? 1.0 : std::sin(CTLRX_SINC_PI * theX) / (CTLRX_SINC_PI * theX);
  const double aRatio = theX / aHalf;
  const double aScale = CTLRX_SINC_PI * theV * aHalf;
  return aSinc * std::cosh(aScale * std::sqrt(1.0 - aRatio * aRatio)) / std::cosh(aScale);
}

CSincTable::CSincTable(double theOversampling)
    : mRows(static_cast<size_t>(CTLRX_SINC_STEPS + 1) * CTLRX_SINC_TAPS) {
  // v = 1 - 1/osr; at or below critical sampling the window is flat.
  const double aV = theOversampling > 1.0 ? 1.0 - 1.0 / theOversampling : 0.0;
  double aWeights[CTLRX_SINC_TAPS];
  for (int32_t r = 0; r <= CTLRX_SINC_STEPS; ++r) {
    const double aFraction = double(r) / CTLRX_SINC_STEPS;
    double aSum = 0.0;
    for (int32_t k = 0; k < CTLRX_SINC_TAPS; ++k) {
      aWeights[k] = knab(aFraction + CTLRX_SINC_BEFORE - k, aV);
      aSum += aWeights[k];
    }
    // Unit sum: a constant comes back exactly and the gain does not ripple
    // with the fraction.
    for (int32_t k = 0; k < CTLRX_SINC_TAPS; ++k)
      mRows[static_cast<size_t>(r) * CTLRX_SINC_TAPS + k] = static_cast<float>(aWeights[k] / aSum);
  }
}

void fdfSincResampleLine(const CSincTable &theTable, const std::complex<float> *theIn, int32_t theCount,
                         const double *thePositions, int32_t theOutCount, std::complex<float> *theOut) {
  const double aLast = double(theCount) - 1.0;
  for (int32_t i = 0; i < theOutCount; ++i) {
    const double aPosition = thePositions[i];
    if (!(aPosition >= 0.0 && aPosition <= aLast)) { // also NaN
      theOut[i] = std::complex<float>(0.0f, 0.0f);
      continue;
    }
    int64_t aFirst = 0;
    double aFraction = 0.0;
    fdfSplitPosition(aPosition, aFirst, aFraction);
    const float *aW = theTable.weights(aFraction);
    const int64_t aTap0 = aFirst - CTLRX_SINC_BEFORE;
    float aRe = 0.0f, aIm = 0.0f;
    if (aTap0 >= 0 && aTap0 + CTLRX_SINC_TAPS <= theCount) {
      const std::complex<float> *aIn = theIn + aTap0;
      for (int32_t k = 0; k < CTLRX_SINC_TAPS; ++k) {
        aRe += aW[k] * aIn[k].real();
        aIm += aW[k] * aIn[k].imag();
      }
    } else { // near an edge: taps outside the line are zero
      for (int32_t k = 0; k < CTLRX_SINC_TAPS; ++k) {
        const int64_t j = aTap0 + k;
        if (j >= 0 && j < theCount) {
          aRe += aW[k] * theIn[j].real();
          aIm += aW[k] * theIn[j].imag();
        }
      }
    }
    theOut[i] = std::complex<float>(aRe, aIm);
  }
}
