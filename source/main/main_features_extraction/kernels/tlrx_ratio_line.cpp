// Ratio of two lines: out = a / b, or 10 log10(a / b) in decibels. A pixel
// is theNull where either input holds its own null value (a NaN null matches
// NaN; a NaN input with a numeric null stays a value and gives NaN) or the
// divisor is not above the smallest normal float.
#include "tlrx_ratio_line.h"

#include <array>
#include <cmath>
#include <limits>

namespace {

constexpr double CTLRX_EPS = 1.1754943508222875e-38;

// Counting classes: below each limit in turn, then "Other".
const double theHistogramLimits[CTLRX_RATIO_COUNTED_CLASSES - 1] = {-10, -1, -0.1, 0.1, 1, 10, 100, 1000, 10000, 100000, 1000000};
using CFloatLimits = std::array<float, CTLRX_RATIO_COUNTED_CLASSES - 1>;

CFloatLimits fdfFloatLimits() {
  CFloatLimits aLimits;
  for (size_t k = 0; k < aLimits.size(); ++k) {
    aLimits[k] = static_cast<float>(theHistogramLimits[k]);
    if (static_cast<double>(aLimits[k]) < theHistogramLimits[k])
      aLimits[k] = std::nextafter(aLimits[k], std::numeric_limits<float>::infinity());
  }
  return aLimits;
}

} // namespace

// Whether v is a valid cell against null D: not NaN-with-NaN, not within
// the smallest normal float of D.
namespace {

inline bool fdfValidCell(double theValue, double theNull, bool theNullIsNaN) {
  return theNullIsNaN ? theValue == theValue
                      : !(theValue >= theNull - CTLRX_EPS && theValue <= theNull + CTLRX_EPS);
}

} // namespace

void fdfRatioLine(const float *theA, double theNullA, const float *theB, double theNullB, int32_t thePixels,
                  bool theDecibel, float theNull, float *theOut, long long *theHistogram) {
  const bool aNaNA = std::isnan(theNullA);
  const bool aNaNB = std::isnan(theNullB);
  // Branch-free so the compiler vectorises it: invalid pairs divide by 1.
  for (int32_t i = 0; i < thePixels; ++i) {
    const double aA = theA[i];
    const double aB = theB[i];
    const bool aValid = fdfValidCell(aA, theNullA, aNaNA) & fdfValidCell(aB, theNullB, aNaNB) & !(aB <= CTLRX_EPS);
    const double aRatio = aA / (aValid ? aB : 1.0);
    theOut[i] = aValid ? static_cast<float>(aRatio) : theNull;
  }
  if (theDecibel)
    for (int32_t i = 0; i < thePixels; ++i) {
      const double aA = theA[i];
      const double aB = theB[i];
      if (fdfValidCell(aA, theNullA, aNaNA) && fdfValidCell(aB, theNullB, aNaNB) && !(aB <= CTLRX_EPS))
        theOut[i] = static_cast<float>(10.0 * std::log10(aA / aB));
    }
  // The class is the number of limits not above the value ("Other" for NaN),
  // found with float compares against the limits rounded up to floats, which
  // gives the same answer as comparing the stored float with each limit.
  static const CFloatLimits theFloatLimits = fdfFloatLimits();
  for (int32_t i = 0; i < thePixels; ++i) {
    const float aValue = theOut[i];
    int aClass = 0;
#pragma GCC unroll 11
    for (size_t k = 0; k < theFloatLimits.size(); ++k)
      aClass += aValue >= theFloatLimits[k];
    ++theHistogram[aValue != aValue ? CTLRX_RATIO_COUNTED_CLASSES - 1 : aClass];
  }
}

