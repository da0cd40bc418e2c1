#include "tlrx_resampling_kernels.h"

#include <algorithm>
#include <cmath>

namespace {

constexpr double CTLRX_PI = 3.14159265358979323846;
constexpr double CTLRX_MIN_OVERLAP = 1e-9;
constexpr int32_t CTLRX_SINC_LOBES = 4;

struct SKernelEntry {
  ETLRXKernel mKernel;
  const char *mName;
  ETLRXKernel mFallback;
  int32_t mTaps;   // cells of the support (footprint kernels: 0, variable)
  int32_t mBefore; // cells of the support before j0 = floor(position)
};

const SKernelEntry sKernels[] = {
    {ETLRXKernel::NEAREST, "nearest_neighbour", ETLRXKernel::NEAREST, 1, 0},
    {ETLRXKernel::BILINEAR, "bilinear_interpolation", ETLRXKernel::NEAREST, 2, 0},
    {ETLRXKernel::CUBIC3, "3th_order_cc", ETLRXKernel::BILINEAR, 4, 1},
    {ETLRXKernel::CUBIC4, "4th_order_cc", ETLRXKernel::CUBIC3, 6, 2},
    {ETLRXKernel::SINC, "sinc_interpolation", ETLRXKernel::CUBIC4, 2 * CTLRX_SINC_LOBES, CTLRX_SINC_LOBES - 1},
    {ETLRXKernel::MEAN, "mean", ETLRXKernel::NEAREST, 0, 0},
    {ETLRXKernel::WEIGHT, "weight", ETLRXKernel::NEAREST, 0, 0},
};

const SKernelEntry &fdfEntry(ETLRXKernel theKernel) {
  for (const SKernelEntry &aEntry : sKernels)
    if (aEntry.mKernel == theKernel)
      return aEntry;
  return sKernels[0];
}

// Keys (1981), a = -0.5: third-order accurate.
double fdfCubic3(double theDistance) {
  const double s = std::fabs(theDistance);
  if (s < 1.0)
    return (1.5 * s - 2.5) * s * s + 1.0;
  if (s < 2.0)
    return ((-0.5 * s + 2.5) * s - 4.0) * s + 2.0;
  return 0.0;
}

// Keys (1981), six-point kernel: fourth-order accurate.
double fdfCubic4(double theDistance) {
  const double s = std::fabs(theDistance);
  if (s < 1.0)
    return ((4.0 / 3.0) * s - 7.0 / 3.0) * s * s + 1.0;
  if (s < 2.0)
    return ((-7.0 / 12.0 * s + 3.0) * s - 59.0 / 12.0) * s + 15.0 / 6.0;
  if (s < 3.0)
    return ((1.0 / 12.0 * s - 2.0 / 3.0) * s + 7.0 / 4.0) * s - 1.5;
  return 0.0;
}

double fdfSinc(double theX) { return theX == 0.0 ? 1.0 : std::sin(CTLRX_PI * theX) / (CTLRX_PI * theX); }

double fdfLanczos(double theDistance) {
  return std::fabs(theDistance) < CTLRX_SINC_LOBES ? fdfSinc(theDistance) * fdfSinc(theDistance / CTLRX_SINC_LOBES)
                                                   : 0.0;
}

double fdfKernelWeight(ETLRXKernel theKernel, double theDistance) {
  switch (theKernel) {
  case ETLRXKernel::BILINEAR: return std::max(0.0, 1.0 - std::fabs(theDistance));
  case ETLRXKernel::CUBIC3: return fdfCubic3(theDistance);
  case ETLRXKernel::CUBIC4: return fdfCubic4(theDistance);
  case ETLRXKernel::SINC: return fdfLanczos(theDistance);
  default: return 0.0;
  }
}

} // namespace

ETLRXKernel fdfKernelFromName(const std::string &theName, bool &theKnown) {
  for (const SKernelEntry &aEntry : sKernels)
    if (theName == aEntry.mName) {
      theKnown = true;
      return aEntry.mKernel;
    }
  theKnown = false;
  return ETLRXKernel::NEAREST;
}

const char *fdfKernelName(ETLRXKernel theKernel) { return fdfEntry(theKernel).mName; }
ETLRXKernel fdfKernelFallback(ETLRXKernel theKernel) { return fdfEntry(theKernel).mFallback; }
bool fdfIsFootprintKernel(ETLRXKernel theKernel) { return fdfEntry(theKernel).mTaps == 0; }
int32_t fdfKernelTapCount(ETLRXKernel theKernel) { return fdfEntry(theKernel).mTaps; }

void fdfInterpolationTaps(ETLRXKernel theKernel, double thePosition, SKernelTaps &theTaps) {
  const SKernelEntry &aEntry = fdfEntry(theKernel);
  if (theKernel == ETLRXKernel::NEAREST || aEntry.mTaps == 0) {
    theTaps.mFirst = static_cast<int32_t>(std::floor(thePosition + 0.5));
    theTaps.mCount = 1;
    theTaps.mWeight[0] = 1.0;
    return;
  }
  const double aFloor = std::floor(thePosition);
  const double aFraction = thePosition - aFloor;
  theTaps.mFirst = static_cast<int32_t>(aFloor) - aEntry.mBefore;
  theTaps.mCount = aEntry.mTaps;
  double aSum = 0.0;
  for (int32_t k = 0; k < aEntry.mTaps; ++k) {
    theTaps.mWeight[k] = fdfKernelWeight(theKernel, aFraction + aEntry.mBefore - k);
    aSum += theTaps.mWeight[k];
  }
  // The windowed sinc does not sum to 1 by itself; the others do exactly.
  if (theKernel == ETLRXKernel::SINC)
    for (int32_t k = 0; k < aEntry.mTaps; ++k)
      theTaps.mWeight[k] /= aSum;
}

bool fdfFootprintTaps(ETLRXKernel theKernel, double thePosition, double theHalfWidth, SKernelTaps &theTaps) {
  const double aLow = thePosition - theHalfWidth;
  const double aHigh = thePosition + theHalfWidth;
  const double aFirst = std::floor(aLow + 0.5);
  const double aLast = std::floor(aHigh + 0.5);
  if (!(aLast - aFirst < CTLRX_KERNEL_MAX_TAPS))
    return false;
  theTaps.mFirst = static_cast<int32_t>(aFirst);
  theTaps.mCount = static_cast<int32_t>(aLast - aFirst) + 1;
  for (int32_t k = 0; k < theTaps.mCount; ++k) {
    const double aCentre = aFirst + k;
    const double aOverlap = std::min(aHigh, aCentre + 0.5) - std::max(aLow, aCentre - 0.5);
    const bool aCounts = aOverlap > CTLRX_MIN_OVERLAP;
    theTaps.mWeight[k] = !aCounts ? 0.0 : theKernel == ETLRXKernel::MEAN ? 1.0 : aOverlap;
  }
  return true;
}
