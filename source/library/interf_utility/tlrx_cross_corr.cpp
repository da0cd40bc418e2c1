// Shift of one window pair (see tlrx_cross_corr.h for the measures).
#include "tlrx_cross_corr.h"

#include <algorithm>
#include <cmath>

#include "tlrx_enviroment.h"

namespace {

const char *failureTrace(ETLRXPairFailure theFailure) {
  switch (theFailure) {
  case ETLRXPairFailure::FORWARD_MASTER: return "\n\nERROR: DURING FORWARD FFT OF MASTER :";
  case ETLRXPairFailure::FORWARD_SLAVE: return "\n\nERROR: DURING FORWARD FFT OF SLAVE :";
  default: return "\n\nERROR: DURING BACKWARD FFT OF MASTER :";
  }
}

// A failing transform is traced with its size; the pair then fails.
bool run(const CFftPlan2D &thePlan, TLRXComplex *theData, ETLRXPairFailure theFailure) {
  if (thePlan.execute(theData))
    return true;
  fdfTraceMessage("%s transform of %d x %d not available\n", failureTrace(theFailure), thePlan.rows(),
                  thePlan.cols());
  return false;
}

// sqrt(sum |w - mean|^2) in double precision.
double energyOf(const TLRXComplex *theData, size_t theCount) {
  std::complex<double> aMean(0.0, 0.0);
  for (size_t i = 0; i < theCount; ++i)
    aMean += std::complex<double>(theData[i]);
  aMean /= static_cast<double>(theCount);
  double aSum = 0.0;
  for (size_t i = 0; i < theCount; ++i)
    aSum += std::norm(std::complex<double>(theData[i]) - aMean);
  return std::sqrt(aSum);
}

} // namespace

CCrossCorrelator::CCrossCorrelator(int32_t theLines, int32_t thePixels, int32_t theOversampling, bool theCoherent)
    : mLines(theLines), mPixels(thePixels), mFactor(theCoherent ? 1 : 2), mOversampling(std::max(1, theOversampling)),
      mCoherent(theCoherent), mWindowForward(fdfFftPlan(theLines, thePixels, ETLRXFftDirection::FORWARD)),
      mForward(fdfFftPlan(mFactor * theLines, mFactor * thePixels, ETLRXFftDirection::FORWARD)),
      mInverse(fdfFftPlan(mFactor * theLines, mFactor * thePixels, ETLRXFftDirection::INVERSE)),
      mChip(static_cast<size_t>(std::max(theLines, 1)) * static_cast<size_t>(std::max(thePixels, 1))),
      mMaster(mChip.size() * static_cast<size_t>(mFactor * mFactor)), mSlave(mMaster.size()),
      // Half a lag of the correlation grid and one step more either side of
      // its integer peak (the true peak of a sampled unimodal peak lies within
      // half a lag of its largest sample), in steps of 1 / oversampling pixel.
      mZoom(mFactor * std::max(theLines, 1), mFactor * std::max(thePixels, 1),
            static_cast<double>(mFactor) / mOversampling, (mOversampling + 2 * mFactor - 1) / (2 * mFactor) + 1),
      mZoomed(static_cast<size_t>(mZoom.side()) * static_cast<size_t>(mZoom.side())) {}

bool CCrossCorrelator::isValid() const { return mWindowForward.isValid() && mForward.isValid() && mInverse.isValid(); }

// Spectrum of the window as correlated (amplitude on the 2x grid, or the
// complex window itself) into theOut, with its energy.
bool CCrossCorrelator::detect(const TLRXComplex *theWindow, CFftBuffer &theOut, double &theEnergy, bool theMaster) {
  const ETLRXPairFailure aForward = theMaster ? ETLRXPairFailure::FORWARD_MASTER : ETLRXPairFailure::FORWARD_SLAVE;
  const size_t aCells = theOut.size();
  if (mCoherent) {
    std::copy(theWindow, theWindow + aCells, theOut.data());
  } else {
    std::copy(theWindow, theWindow + mChip.size(), mChip.data());
    if (!run(mWindowForward, mChip.data(), aForward))
      return false;
    fdfZeroPadSpectrum(mChip.data(), mLines, mPixels, theOut.data(), 2 * mLines, 2 * mPixels);
    if (!run(mInverse, theOut.data(), ETLRXPairFailure::BACKWARD))
      return false;
    for (size_t i = 0; i < aCells; ++i)
      theOut[i] = TLRXComplex(std::abs(theOut[i]), 0.0f);
  }
  theEnergy = energyOf(theOut.data(), aCells);
  return run(mForward, theOut.data(), aForward);
}

STLRXWindowShift CCrossCorrelator::estimate(const TLRXComplex *theMaster, const TLRXComplex *theSlave) {
  STLRXWindowShift aShift;
  double aMasterEnergy = 0.0, aSlaveEnergy = 0.0;
  if (!detect(theMaster, mMaster, aMasterEnergy, true)) {
    aShift.mFailure = ETLRXPairFailure::FORWARD_MASTER;
    return aShift;
  }
  if (!detect(theSlave, mSlave, aSlaveEnergy, false)) {
    aShift.mFailure = ETLRXPairFailure::FORWARD_SLAVE;
    return aShift;
  }
  const double aEnergy = aMasterEnergy * aSlaveEnergy;
  if (!(aEnergy > 0.0) || !std::isfinite(aEnergy)) {
    aShift.mFailure = ETLRXPairFailure::ZERO_ENERGY;
    return aShift;
  }
  // Cross-spectrum M conj(S) without its zero frequency (the means), kept in
  // mMaster for the zoom; its inverse, the integer-lag surface, in mSlave.
  const size_t aCells = mMaster.size();
  for (size_t i = 0; i < aCells; ++i) {
    const TLRXComplex aM = mMaster[i], aS = mSlave[i];
    mMaster[i] = TLRXComplex(aM.real() * aS.real() + aM.imag() * aS.imag(), aM.imag() * aS.real() - aM.real() * aS.imag());
  }
  mMaster[0] = TLRXComplex(0.0f, 0.0f);
  std::copy(mMaster.data(), mMaster.data() + aCells, mSlave.data());
  if (!run(mInverse, mSlave.data(), ETLRXPairFailure::BACKWARD)) {
    aShift.mFailure = ETLRXPairFailure::BACKWARD;
    return aShift;
  }
  size_t aPeak = 0;
  double aPeakPower = -1.0, aTotal = 0.0;
  for (size_t i = 0; i < aCells; ++i) {
    const double aPower = std::norm(std::complex<double>(mSlave[i]));
    aTotal += aPower;
    if (aPower > aPeakPower) {
      aPeakPower = aPower;
      aPeak = i;
    }
  }
  const int32_t aRows = mFactor * mLines, aCols = mFactor * mPixels;
  int32_t aRow = static_cast<int32_t>(aPeak / static_cast<size_t>(aCols));
  int32_t aCol = static_cast<int32_t>(aPeak % static_cast<size_t>(aCols));
  if (aRow > aRows / 2)
    aRow -= aRows;
  if (aCol > aCols / 2)
    aCol -= aCols;
  const double aRest = (aTotal - aPeakPower) / static_cast<double>(std::max<size_t>(aCells - 1, 1));
  aShift.mSnr = aRest > 0.0 ? aPeakPower / aRest : 0.0;

  mZoom.evaluate(mMaster.data(), aRow, aCol, mZoomed.data());
  const int32_t aSide = mZoom.side(), aHalf = aSide / 2;
  size_t aBest = static_cast<size_t>(aHalf) * aSide + aHalf;
  double aBestPower = std::norm(std::complex<double>(mZoomed[aBest]));
  for (size_t i = 0; i < mZoomed.size(); ++i) {
    const double aPower = std::norm(std::complex<double>(mZoomed[i]));
    if (aPower > aBestPower) {
      aBestPower = aPower;
      aBest = i;
    }
  }
  const double aStep = static_cast<double>(mFactor) / mOversampling;
  const double aRowLag = aRow + (static_cast<int32_t>(aBest / aSide) - aHalf) * aStep;
  const double aColLag = aCol + (static_cast<int32_t>(aBest % aSide) - aHalf) * aStep;
  aShift.mAzimuthShift = -aRowLag / mFactor;
  aShift.mRangeShift = -aColLag / mFactor;
  aShift.mCorrelation = std::sqrt(aBestPower) / (static_cast<double>(aCells) * aEnergy);
  return aShift;
}
