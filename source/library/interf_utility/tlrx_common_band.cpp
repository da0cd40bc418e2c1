// Common-band filters and range oversampling (see tlrx_common_band.h).
#include "tlrx_common_band.h"

#include <algorithm>
#include <cmath>
#include <limits>

#include "tlrx_errors.h"

namespace {

constexpr double CTLRX_CB_PI = 3.14159265358979323846;
// Band edges are kept: a bin on an edge computed in double stays in.
constexpr double CTLRX_CB_EDGE = 1e-9;
constexpr double CTLRX_CB_MIN_COMMON_WIDTH = 0.05;

int32_t signedBin(int32_t theK, int32_t theN) { return 2 * theK <= theN ? theK : theK - theN; }

bool inBand(double theFrequency, const SRangeBand &theBand) {
  return theFrequency >= theBand.mLow - CTLRX_CB_EDGE && theFrequency <= theBand.mHigh + CTLRX_CB_EDGE;
}

// Modified Bessel function of order 0 by its series (converges fast for the
// Kaiser betas used here).
double besselI0(double theX) {
  double aSum = 1.0, aTerm = 1.0;
  const double aQuarter = 0.25 * theX * theX;
  for (int k = 1; k < 50 && aTerm > 1e-17 * aSum; ++k) {
    aTerm *= aQuarter / (static_cast<double>(k) * k);
    aSum += aTerm;
  }
  return aSum;
}

double sinc(double theX) { return theX == 0.0 ? 1.0 : std::sin(CTLRX_CB_PI * theX) / (CTLRX_CB_PI * theX); }

} // namespace

// ------------------------------------------------------------ range bands

bool fdfCommonRangeBands(double theFringe, double theBandwidth, SRangeBand &theMaster, SRangeBand &theSlave) {
  theMaster = SRangeBand();
  theSlave = SRangeBand();
  // NaN fails every comparison and so gives false too.
  if (!(theBandwidth > 0.0 && theBandwidth <= 1.0) || !(std::fabs(theFringe) < theBandwidth))
    return false;
  // The master's baseband frequency k sees the ground at k + c_m, the slave's
  // at k + c_s, with f = c_s - c_m: each keeps its band shifted by its
  // partner's offset, cut to its own band and to the sampled interval.
  const double aHalf = 0.5 * theBandwidth;
  theMaster.mLow = std::max(-0.5, std::max(-aHalf, theFringe - aHalf));
  theMaster.mHigh = std::min(0.5, std::min(aHalf, theFringe + aHalf));
  theSlave.mLow = std::max(-0.5, std::max(-aHalf, -theFringe - aHalf));
  theSlave.mHigh = std::min(0.5, std::min(aHalf, -theFringe + aHalf));
  return true;
}

// ------------------------------------------------------ range oversampler

CRangeOversampler::CRangeOversampler(int32_t thePixels, int32_t theFactor)
    : mPixels(thePixels), mFactor(theFactor), mForward(nullptr), mInverse(nullptr) {
  if (thePixels < 1 || theFactor < 1 || int64_t(thePixels) * theFactor > (int64_t(1) << 26))
    TLRX_RAISE_F(CTLRX_ERR_IMAGE_SIZES, "range oversampling of %d pixels by %d", thePixels, theFactor);
  mSpectrum.resize(static_cast<size_t>(thePixels));
  mPadded.resize(static_cast<size_t>(thePixels) * static_cast<size_t>(theFactor));
  mForward = &fdfFftPlan(1, thePixels, ETLRXFftDirection::FORWARD);
  mInverse = &fdfFftPlan(1, thePixels * theFactor, ETLRXFftDirection::INVERSE);
  if (!mForward->isValid() || !mInverse->isValid())
    TLRX_RAISE_F(CTLRX_ERR_ALLOCATION, "FFT plans of %d and %d points", thePixels, thePixels * theFactor);
}

void CRangeOversampler::process(const TLRXComplex *theIn, const SRangeBand *theBand, TLRXComplex *theOut) {
  const int32_t n = mPixels, m = mPixels * mFactor;
  std::copy_n(theIn, n, mSpectrum.data());
  mForward->execute(mSpectrum.data());
  fdfZeroPadSpectrum(mSpectrum.data(), 1, n, mPadded.data(), 1, m);
  if (theBand != nullptr) {
    // Only the bins of signed frequency |j| <= n / 2 can hold anything; at
    // factor 1 the unsplit Nyquist bin stands for both +0.5 and -0.5.
    const auto aApply = [&](int32_t theFrom, int32_t theTo) {
      for (int32_t i = theFrom; i <= theTo; ++i) {
        const int32_t j = signedBin(i, m);
        const double aFrequency = static_cast<double>(j) / n;
        const bool aKeep =
            inBand(aFrequency, *theBand) || (m == n && 2 * j == n && inBand(-aFrequency, *theBand));
        if (!aKeep)
          mPadded[static_cast<size_t>(i)] = TLRXComplex(0.0f, 0.0f);
      }
    };
    aApply(0, std::min(n / 2, m - 1));
    aApply(std::max(n / 2 + 1, m - n / 2), m - 1);
  }
  mInverse->execute(mPadded.data());
  const float aScale = 1.0f / static_cast<float>(n);
  const TLRXComplex *aPadded = mPadded.data();
  for (int32_t i = 0; i < m; ++i)
    theOut[i] = TLRXComplex(aPadded[i].real() * aScale, aPadded[i].imag() * aScale);
}

// --------------------------------------------------------- fringe estimate

CFringeEstimator::CFringeEstimator(int32_t thePixels) : mPixels(thePixels) {
  if (thePixels < 4 || thePixels > (1 << 26))
    TLRX_RAISE_F(CTLRX_ERR_IMAGE_SIZES, "fringe estimation over %d pixels (4 or more)", thePixels);
  mLine.resize(static_cast<size_t>(thePixels));
  mPower.assign(static_cast<size_t>(thePixels), 0.0);
  mPlan = &fdfFftPlan(1, thePixels, ETLRXFftDirection::FORWARD);
  if (!mPlan->isValid())
    TLRX_RAISE_F(CTLRX_ERR_ALLOCATION, "FFT plan of %d points", thePixels);
}

void CFringeEstimator::reset() {
  std::fill(mPower.begin(), mPower.end(), 0.0);
  mLinesAdded = 0;
}

void CFringeEstimator::add(const TLRXComplex *theMaster, const TLRXComplex *theSlave) {
  TLRXComplex *aLine = mLine.data();
  for (int32_t i = 0; i < mPixels; ++i) {
    const float mr = theMaster[i].real(), mi = theMaster[i].imag();
    const float sr = theSlave[i].real(), si = theSlave[i].imag();
    const bool aNull = (mr == 0.0f && mi == 0.0f) || (sr == 0.0f && si == 0.0f);
    aLine[i] = aNull ? TLRXComplex(0.0f, 0.0f) : TLRXComplex(mr * sr + mi * si, mi * sr - mr * si);
  }
  mPlan->execute(aLine);
  for (int32_t i = 0; i < mPixels; ++i)
    mPower[static_cast<size_t>(i)] += std::norm(std::complex<double>(aLine[i]));
  ++mLinesAdded;
}

bool CFringeEstimator::result(double &theFringe, double &theSnr) const {
  theFringe = 0.0;
  theSnr = 0.0;
  if (mLinesAdded == 0)
    return false;
  const int32_t n = mPixels;
  const auto aPower = [&](int32_t theK) { return mPower[static_cast<size_t>(((theK % n) + n) % n)]; };
  int32_t aPeak = 0;
  double aTotal = 0.0;
  for (int32_t k = 0; k < n; ++k) {
    aTotal += mPower[static_cast<size_t>(k)];
    if (mPower[static_cast<size_t>(k)] > mPower[static_cast<size_t>(aPeak)])
      aPeak = k;
  }
  if (!(aTotal > 0.0))
    return false;
  const double aPeakPower = aPower(aPeak - 1) + aPower(aPeak) + aPower(aPeak + 1);
  const double aRest = aTotal - aPeakPower;
  theSnr = aRest > 0.0 ? n * aPeakPower / aRest : std::numeric_limits<double>::infinity();
  if (theSnr < CTLRX_FRINGE_MIN_SNR)
    return false;
  // The larger neighbour's side; amplitudes above the mean noise level.
  const double aNoise = aRest / (n - 3);
  const double aLeft = std::max(aPower(aPeak - 1) - aNoise, 0.0), aRight = std::max(aPower(aPeak + 1) - aNoise, 0.0);
  const double aCentre = std::max(aPower(aPeak) - aNoise, std::numeric_limits<double>::min());
  const double aRatio = std::sqrt(std::max(aLeft, aRight) / aCentre);
  const double aOffset = std::min(aRatio / (1.0 + aRatio), 0.5) * (aRight >= aLeft ? 1.0 : -1.0);
  double aFringe = (signedBin(aPeak, n) + aOffset) / n;
  aFringe -= std::floor(aFringe + 0.5); // [-0.5, 0.5)
  theFringe = aFringe;
  return true;
}

// ------------------------------------------------------ fringe from phase

double fdfFringeFromPhase(const float *thePhase, int32_t thePixels, double theNull) {
  const auto aValid = [&](float theValue) { return !std::isnan(theValue) && static_cast<double>(theValue) != theNull; };
  double aSum = 0.0;
  int64_t aCount = 0;
  for (int32_t i = 0; i + 1 < thePixels; ++i) {
    if (!aValid(thePhase[i]) || !aValid(thePhase[i + 1]))
      continue;
    double aStep = static_cast<double>(thePhase[i + 1]) - thePhase[i];
    aStep -= 2.0 * CTLRX_CB_PI * std::floor(aStep / (2.0 * CTLRX_CB_PI) + 0.5);
    aSum += aStep;
    ++aCount;
  }
  return aCount == 0 ? 0.0 : aSum / (2.0 * CTLRX_CB_PI * static_cast<double>(aCount));
}

// ------------------------------------------------------- azimuth filter

CAzimuthBandFilter::CAzimuthBandFilter(int32_t thePixels, const std::vector<double> &theMasterCentroid,
                                       const std::vector<double> &theSlaveCentroid, double theBandwidth)
    : mPixels(thePixels), mHalf(CTLRX_AZIMUTH_FILTER_TAPS / 2) {
  if (thePixels < 1)
    TLRX_RAISE_F(CTLRX_ERR_IMAGE_SIZES, "azimuth filter of %d pixels", thePixels);
  if (theMasterCentroid.size() != static_cast<size_t>(thePixels) ||
      theSlaveCentroid.size() != static_cast<size_t>(thePixels))
    TLRX_RAISE_F(CTLRX_ERR_SIZE_MISMATCH, "Doppler centroids of %zu and %zu columns for %d pixels",
                 theMasterCentroid.size(), theSlaveCentroid.size(), thePixels);
  const size_t aPixels = static_cast<size_t>(thePixels);
  mCos.assign(aPixels * static_cast<size_t>(mHalf + 1), 0.0f);
  mSin.assign(aPixels * static_cast<size_t>(mHalf + 1), 0.0f);
  mZeros.assign(aPixels, TLRXComplex(0.0f, 0.0f));
  std::vector<double> aWindow(static_cast<size_t>(mHalf + 1)), aTaps(static_cast<size_t>(mHalf + 1));
  const double aBeta = CTLRX_AZIMUTH_KAISER_BETA;
  for (int32_t j = 0; j <= mHalf; ++j) {
    const double aX = static_cast<double>(j) / mHalf;
    aWindow[static_cast<size_t>(j)] = besselI0(aBeta * std::sqrt(std::max(0.0, 1.0 - aX * aX))) / besselI0(aBeta);
  }
  for (size_t c = 0; c < aPixels; ++c) {
    // Centroids are taken as given (they may pass +-0.5): two centroids a
    // line rate apart see different ground frequencies, although both
    // spectra alias to the same place.
    const double fm = theMasterCentroid[c], fs = theSlaveCentroid[c];
    const bool aKnown = std::isfinite(fm) && std::isfinite(fs) && std::isfinite(theBandwidth);
    const double aWidth = std::max(aKnown ? std::min(theBandwidth, 1.0) - std::fabs(fs - fm) : 0.0,
                                   CTLRX_CB_MIN_COMMON_WIDTH);
    const double aCentre = aKnown ? 0.5 * (fm + fs) : 0.0;
    double aSum = 0.0;
    for (int32_t j = 0; j <= mHalf; ++j) {
      aTaps[static_cast<size_t>(j)] = aWidth * sinc(aWidth * j) * aWindow[static_cast<size_t>(j)];
      aSum += (j == 0 ? 1.0 : 2.0) * aTaps[static_cast<size_t>(j)];
    }
    for (int32_t j = 0; j <= mHalf; ++j) {
      const double aTap = aTaps[static_cast<size_t>(j)] / aSum;
      double aTurns = aCentre * j;
      aTurns -= std::floor(aTurns);
      const size_t aAt = static_cast<size_t>(j) * aPixels + c;
      mCos[aAt] = static_cast<float>(aTap * std::cos(2.0 * CTLRX_CB_PI * aTurns));
      mSin[aAt] = static_cast<float>(aTap * std::sin(2.0 * CTLRX_CB_PI * aTurns));
    }
  }
}

void CAzimuthBandFilter::filterLine(const TLRXComplex *const *theLines, int32_t /*theLine*/,
                                    TLRXComplex *theOut) const {
  // out(l) = sum_j h_j x(l - j), x(l - j) = theLines[half - j]; h_j = a_j + i
  // b_j and h_-j = a_j - i b_j, so the pair j, -j adds a_j p + i b_j q with
  // p = u_j + u_-j and q = u_j - u_-j. Columns go in blocks so that the
  // accumulators stay in the first-level cache.
  constexpr int32_t aBlock = 512;
  const auto aLine = [&](int32_t k) {
    const TLRXComplex *aPointer = theLines[k];
    return reinterpret_cast<const float *>(aPointer != nullptr ? aPointer : mZeros.data());
  };
  float *aOut = reinterpret_cast<float *>(theOut);
  const size_t aPixels = static_cast<size_t>(mPixels);
  for (int32_t c0 = 0; c0 < mPixels; c0 += aBlock) {
    const int32_t aCount = std::min(aBlock, mPixels - c0);
    float *o = aOut + 2 * c0;
    {
      const float *u = aLine(mHalf) + 2 * c0;
      const float *a = mCos.data() + c0;
      for (int32_t c = 0; c < aCount; ++c) {
        o[2 * c] = a[c] * u[2 * c];
        o[2 * c + 1] = a[c] * u[2 * c + 1];
      }
    }
    for (int32_t j = 1; j <= mHalf; ++j) {
      const float *u = aLine(mHalf - j) + 2 * c0;
      const float *v = aLine(mHalf + j) + 2 * c0;
      const float *a = mCos.data() + static_cast<size_t>(j) * aPixels + c0;
      const float *b = mSin.data() + static_cast<size_t>(j) * aPixels + c0;
      for (int32_t c = 0; c < aCount; ++c) {
        const float pr = u[2 * c] + v[2 * c], pi = u[2 * c + 1] + v[2 * c + 1];
        const float qr = u[2 * c] - v[2 * c], qi = u[2 * c + 1] - v[2 * c + 1];
        o[2 * c] += a[c] * pr - b[c] * qi;
        o[2 * c + 1] += a[c] * pi + b[c] * qr;
      }
    }
  }
}
