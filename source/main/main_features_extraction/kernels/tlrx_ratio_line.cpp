// Ratio of two lines: out = a / b, or 10 log10(a / b) in decibels. A pixel
// is theNull where either input is no data by the raster rule (tlrx_no_data.h)
// against its own null value, or the divisor is not above the smallest normal
// float. Ratio keeps the rule as it is: a NaN input with a numeric null stays
// a value and gives NaN.
#include "tlrx_ratio_line.h"

#include "tlrx_no_data.h"

#include <array>
#include <cmath>
#include <limits>

namespace {

// Ratio's own rule: divisors up to the smallest normal float give no ratio.
constexpr double CTLRX_RATIO_MIN_DIVISOR = std::numeric_limits<float>::min();

// Counting classes: below each limit in turn, then "Other".
const double sHistogramLimits[CTLRX_RATIO_COUNTED_CLASSES - 1] = {-10, -1, -0.1, 0.1, 1, 10, 100, 1000, 10000, 100000, 1000000};
using CFloatLimits = std::array<float, CTLRX_RATIO_COUNTED_CLASSES - 1>;

CFloatLimits fdfFloatLimits() {
  CFloatLimits aLimits;
  for (size_t k = 0; k < aLimits.size(); ++k) {
    aLimits[k] = static_cast<float>(sHistogramLimits[k]);
    if (static_cast<double>(aLimits[k]) < sHistogramLimits[k])
      aLimits[k] = std::nextafter(aLimits[k], std::numeric_limits<float>::infinity());
  }
  return aLimits;
}

} // namespace

namespace {

// Both inputs hold data (NaN values included) and the divisor is usable.
inline bool fdfValidPair(double theA, const SNoData &theNullA, double theB, const SNoData &theNullB) {
  return !theNullA.isNull(theA) & !theNullB.isNull(theB) & !(theB <= CTLRX_RATIO_MIN_DIVISOR);
}

} // namespace

void fdfRatioLine(const float *theA, double theNullA, const float *theB, double theNullB, int32_t thePixels,
                  bool theDecibel, float theNull, float *theOut, long long *theHistogram) {
  const SNoData aNullA(theNullA);
  const SNoData aNullB(theNullB);
  // Branch-free so the compiler vectorises it: invalid pairs divide by 1.
  for (int32_t i = 0; i < thePixels; ++i) {
    const double aA = theA[i];
    const double aB = theB[i];
    const bool aValid = fdfValidPair(aA, aNullA, aB, aNullB);
    const double aRatio = aA / (aValid ? aB : 1.0);
    theOut[i] = aValid ? static_cast<float>(aRatio) : theNull;
  }
  if (theDecibel)
    for (int32_t i = 0; i < thePixels; ++i) {
      const double aA = theA[i];
      const double aB = theB[i];
      if (fdfValidPair(aA, aNullA, aB, aNullB))
        theOut[i] = static_cast<float>(10.0 * std::log10(aA / aB));
    }
  // The class is the number of limits not above the value ("Other" for NaN),
  // found with float compares against the limits rounded up to floats, which
  // gives the same answer as comparing the stored float with each limit.
  static const CFloatLimits aFloatLimits = fdfFloatLimits();
  for (int32_t i = 0; i < thePixels; ++i) {
    const float aValue = theOut[i];
    int aClass = 0;
#pragma GCC unroll 11
    for (size_t k = 0; k < aFloatLimits.size(); ++k)
      aClass += aValue >= aFloatLimits[k];
    ++theHistogram[aValue != aValue ? CTLRX_RATIO_COUNTED_CLASSES - 1 : aClass];
  }
}

