// Grey-level stretch of GeoTIFF quick-looks: argument rules, sample
// statistics, mappings and their inverses, histogram table, block reduction.
#include "tlrx_geotiff_stretch.h"

#include "tlrx_cell_types.h"
#include "tlrx_enviroment.h"

#include <algorithm>
#include <cmath>

namespace {

constexpr double sPi = 3.14159265358979323846;

struct SFamilyOfUnits {
  int32_t mUnits;
  ETLRXTiffFamily mFamily;
};

// Data units with a mapping of their own; every other unit is kGeneral.
constexpr SFamilyOfUnits sFamilies[] = {
    {CTLRX_UNITS_POWER, ETLRXTiffFamily::kIntensity},
    {CTLRX_UNITS_CALIBRATED, ETLRXTiffFamily::kIntensity},
    {CTLRX_UNITS_ERS_RAW, ETLRXTiffFamily::kRaw},
    {CTLRX_UNITS_JERS_1_RAW, ETLRXTiffFamily::kRaw},
    {CTLRX_UNITS_INTERFEROGRAMME, ETLRXTiffFamily::kInterferogram},
    {CTLRX_UNITS_FLATTENED_INTERFEROGRAMME, ETLRXTiffFamily::kInterferogram},
    {CTLRX_UNITS_SYNTHETIC_INTERFEROGRAMME, ETLRXTiffFamily::kPhase},
    {CTLRX_UNITS_PHASE, ETLRXTiffFamily::kPhase},
    {CTLRX_UNITS_CLASSIFICATION, ETLRXTiffFamily::kClass},
    {CTLRX_UNITS_TRANSPLANTING, ETLRXTiffFamily::kClass},
};

bool isTiny(double theValue) { return std::fabs(theValue) < CTLRX_TIFF_TINY; }

double meanOrStandIn(double theMean) {
  return std::isnan(theMean) || std::fabs(theMean) <= CTLRX_TIFF_TINY ? CTLRX_TIFF_MEAN_STAND_IN : theMean;
}

// Moves the origin to the forced minimum and lets the forced maximum land on
// the top level; the exponent is kept.
void applyForcedLimits(STLRXStretch &theStretch, const STLRXStretchRequest &theRequest) {
  if (theRequest.mForcedMin == nullptr && theRequest.mForcedMax == nullptr)
    return;
  const double aLow = theRequest.mForcedMin != nullptr ? *theRequest.mForcedMin : theStretch.mOrigin;
  const double aHigh = theRequest.mForcedMax != nullptr ? *theRequest.mForcedMax : theStretch.maxValue();
  if (!(std::isfinite(aLow) && std::isfinite(aHigh) && aHigh > aLow && theStretch.mExponent > 0.0)) {
    fdfTraceMessage("Forced limits [%g , %g] ignored (exponent %g)\n", aLow, aHigh, theStretch.mExponent);
    return;
  }
  theStretch.mOrigin = aLow;
  theStretch.mScale = theStretch.mLevels / std::pow(aHigh - aLow, theStretch.mExponent);
}

STLRXStretch mainStretch(const STLRXStretchRequest &theRequest, const CTiffSample &theSample) {
  STLRXStretch aStretch;
  aStretch.mLevels = theRequest.mLevels;
  const double aLevels = theRequest.mLevels;
  const double aGain = theRequest.mGain;
  const double aExponent = theRequest.mExponent;
  if (theRequest.mFamily == ETLRXTiffFamily::kRaw) {
    aStretch.mMean = theSample.mean();
    aStretch.mScale = aGain;
    aStretch.mExponent = aExponent;
    return aStretch;
  }
  const bool aIntensity = theRequest.mFamily == ETLRXTiffFamily::kIntensity && !theSample.hasNegative();
  const double aMean = meanOrStandIn(aIntensity ? theSample.amplitudeMean() : theSample.mean());
  aStretch.mMean = aMean;
  if (theSample.hasNegative()) {
    aStretch.mScale = 0.5 * aLevels * theRequest.mSaturation * aGain / std::fabs(aMean);
    aStretch.mExponent = 1.0;
    aStretch.mOrigin = -0.5 * aLevels / aStretch.mScale;
    return aStretch;
  }
  aStretch.mScale = aLevels * theRequest.mSaturation * aGain / std::pow(std::fabs(aMean), aExponent);
  aStretch.mExponent = aIntensity ? 0.5 * aExponent : aExponent;
  return aStretch;
}

// Clipped power law with the exponent fixed at compile time where it can be.
template <typename F>
void clipLine(const STLRXStretch &theStretch, const double *theValues, const uint8_t *theValid, int32_t theCount,
              uint8_t *theOut, F thePower) {
  const double aTop = theStretch.mLevels;
  const double aOrigin = theStretch.mOrigin;
  const double aScale = theStretch.mScale;
  const uint8_t aBelow = theStretch.mExponent > 0.0 ? 0 : static_cast<uint8_t>(theStretch.mLevels);
  for (int32_t i = 0; i < theCount; ++i) {
    const double aDistance = theValues[i] - aOrigin;
    const double aLevel = aScale * thePower(aDistance);
    uint8_t aGrey;
    if (!(aDistance > 0.0))
      aGrey = aBelow;
    else if (!(aLevel < aTop))
      aGrey = static_cast<uint8_t>(theStretch.mLevels);
    else
      aGrey = static_cast<uint8_t>(aLevel + 0.5);
    theOut[i] = theValid[i] != 0 ? aGrey : CTLRX_TIFF_NULL_LEVEL;
  }
}

} // namespace

ETLRXTiffFamily fdfTiffFamily(int32_t theDataUnits) {
  for (const SFamilyOfUnits &aEntry : sFamilies)
    if (aEntry.mUnits == theDataUnits)
      return aEntry.mFamily;
  return ETLRXTiffFamily::kGeneral;
}

const char *fdfTiffFamilyName(ETLRXTiffFamily theFamily) {
  switch (theFamily) {
  case ETLRXTiffFamily::kGeneral: return "general";
  case ETLRXTiffFamily::kIntensity: return "intensity";
  case ETLRXTiffFamily::kRaw: return "raw";
  case ETLRXTiffFamily::kInterferogram: return "interferogram";
  case ETLRXTiffFamily::kPhase: return "phase";
  case ETLRXTiffFamily::kClass: return "classes";
  }
  return "general";
}

ETLRXBlockRule fdfTiffBlockRule(ETLRXTiffFamily theFamily) {
  switch (theFamily) {
  case ETLRXTiffFamily::kInterferogram:
  case ETLRXTiffFamily::kPhase:
  case ETLRXTiffFamily::kClass: return ETLRXBlockRule::kCentre;
  default: return ETLRXBlockRule::kAverage;
  }
}

bool fdfTiffUsesPalette(ETLRXTiffFamily theFamily) { return theFamily == ETLRXTiffFamily::kInterferogram; }

// ------------------------------------------------------ argument rules

double fdfTiffSaturation(double theSaturation) {
  return isTiny(theSaturation) || !(theSaturation > 0.0) || !std::isfinite(theSaturation)
             ? CTLRX_TIFF_DEFAULT_SATURATION
             : theSaturation;
}

int32_t fdfTiffReductionFactor(int32_t theFactor) { return theFactor < 1 ? 1 : theFactor; }

double fdfTiffGain(double theGain) {
  return !(theGain > 0.0) || isTiny(theGain) || !std::isfinite(theGain) ? 1.0 : theGain;
}

double fdfTiffExponent(double theExponent) {
  return !(theExponent > CTLRX_TIFF_MIN_EXPONENT) || isTiny(theExponent) || !std::isfinite(theExponent)
             ? 1.0
             : theExponent;
}

int32_t fdfTiffLevels(int32_t theLevels) {
  return theLevels < 1 || theLevels > CTLRX_TIFF_LEVELS ? CTLRX_TIFF_LEVELS : theLevels;
}

// ------------------------------------------------------ sample statistics

void CTiffSample::add(double theValue) {
  if (mCount == 0) {
    mMin = theValue;
    mMax = theValue;
  } else {
    mMin = std::min(mMin, theValue);
    mMax = std::max(mMax, theValue);
  }
  ++mCount;
  const double aDelta = theValue - mMean;
  mMean += aDelta / static_cast<double>(mCount);
  mM2 += aDelta * (theValue - mMean);
  if (theValue > 0.0)
    mSqrtSum += std::sqrt(theValue);
}

void CTiffSample::addParts(double theRe, double theIm) {
  ++mPartCount;
  mReSum += theRe;
  mImSum += theIm;
}

double CTiffSample::stdv() const { return mCount > 0 ? std::sqrt(mM2 / static_cast<double>(mCount)) : 0.0; }

double CTiffSample::amplitudeMean() const { return mCount > 0 ? mSqrtSum / static_cast<double>(mCount) : 0.0; }

double CTiffSample::realMean() const { return mPartCount > 0 ? mReSum / static_cast<double>(mPartCount) : 0.0; }

double CTiffSample::imaginaryMean() const {
  return mPartCount > 0 ? mImSum / static_cast<double>(mPartCount) : 0.0;
}

// ------------------------------------------------------ histogram table

CTiffHistogramLut::CTiffHistogramLut(double theLow, double theHigh, int32_t theClasses, int32_t theLevels)
    : mLow(theLow), mHigh(theHigh > theLow ? theHigh : theLow + 1.0), mClassesPerUnit(0.0),
      mClasses(validClassCount(theClasses) ? theClasses : 2), mLevels(fdfTiffLevels(theLevels)),
      mCounts(static_cast<size_t>(mClasses), 0), mLut(static_cast<size_t>(mClasses), 0),
      mFirstClassOfLevel(static_cast<size_t>(mLevels) + 1, -1) {
  mClassesPerUnit = mClasses / (mHigh - mLow);
}

bool CTiffHistogramLut::validClassCount(int32_t theClasses) {
  return theClasses >= 2 && theClasses <= CTLRX_TIFF_MAX_HISTOGRAM_CLASSES;
}

int32_t CTiffHistogramLut::classOf(double theValue) const {
  const double aClass = (theValue - mLow) * mClassesPerUnit;
  if (!(aClass >= 0.0))
    return 0;
  if (aClass >= mClasses)
    return mClasses - 1;
  return static_cast<int32_t>(aClass);
}

void CTiffHistogramLut::add(double theValue) { ++mCounts[static_cast<size_t>(classOf(theValue))]; }

bool CTiffHistogramLut::equalise() {
  uint64_t aTotal = 0;
  for (uint64_t aCount : mCounts)
    aTotal += aCount;
  if (aTotal == 0)
    return false;
  double aBefore = 0.0;
  int32_t aNextLevel = 0;
  for (int32_t k = 0; k < mClasses; ++k) {
    const double aCount = static_cast<double>(mCounts[static_cast<size_t>(k)]);
    const double aMiddle = (aBefore + 0.5 * aCount) / static_cast<double>(aTotal);
    const int32_t aLevel = std::min(mLevels, static_cast<int32_t>(std::floor(mLevels * aMiddle + 0.5)));
    mLut[static_cast<size_t>(k)] = static_cast<uint8_t>(aLevel);
    for (; aNextLevel <= aLevel; ++aNextLevel)
      mFirstClassOfLevel[static_cast<size_t>(aNextLevel)] = k;
    aBefore += aCount;
  }
  return true;
}

double CTiffHistogramLut::levelValue(int32_t theLevel) const {
  if (theLevel < 0 || theLevel > mLevels)
    return theLevel < 0 ? mLow : mHigh;
  const int32_t aClass = mFirstClassOfLevel[static_cast<size_t>(theLevel)];
  return aClass < 0 ? mHigh : mLow + (aClass + 0.5) / mClassesPerUnit;
}

// ------------------------------------------------------ the stretch

uint8_t STLRXStretch::level(double theValue) const {
  uint8_t aGrey = CTLRX_TIFF_NULL_LEVEL;
  const uint8_t aValid = 1;
  fdfStretchLine(*this, &theValue, &aValid, 1, &aGrey);
  return aGrey;
}

double STLRXStretch::value(int32_t theLevel) const {
  if (mShape == ETLRXStretchShape::kClass)
    return theLevel;
  if (mExponent == 1.0)
    return mOrigin + theLevel / mScale;
  return mOrigin + std::pow(theLevel / mScale, 1.0 / mExponent);
}

STLRXStretch fdfMakeStretch(const STLRXStretchRequest &theRequest, const CTiffSample &theSample) {
  const int32_t aLevels = fdfTiffLevels(theRequest.mLevels);
  STLRXStretch aStretch;
  aStretch.mLevels = aLevels;
  switch (theRequest.mFamily) {
  case ETLRXTiffFamily::kClass:
    aStretch.mShape = ETLRXStretchShape::kClass;
    aStretch.mMean = theSample.mean();
    return aStretch;
  case ETLRXTiffFamily::kInterferogram:
  case ETLRXTiffFamily::kPhase:
    aStretch.mShape = ETLRXStretchShape::kWrap;
    aStretch.mScale = (aLevels + 1) / (2.0 * sPi);
    aStretch.mOrigin = -sPi + sPi / (aLevels + 1);
    aStretch.mMean = theSample.mean();
    return aStretch;
  default: break;
  }
  STLRXStretchRequest aRequest = theRequest;
  aRequest.mLevels = aLevels;
  aStretch = mainStretch(aRequest, theSample);
  applyForcedLimits(aStretch, aRequest);
  return aStretch;
}

STLRXStretch fdfHistogramStretch(const CTiffHistogramLut &theLut) {
  STLRXStretch aStretch;
  aStretch.mLevels = theLut.levels();
  aStretch.mOrigin = theLut.low();
  aStretch.mScale = theLut.levels() / (theLut.high() - theLut.low());
  aStretch.mLut = &theLut;
  return aStretch;
}

void fdfStretchLine(const STLRXStretch &theStretch, const double *theValues, const uint8_t *theValid,
                    int32_t theCount, uint8_t *theOut) {
  if (theStretch.mLut != nullptr) {
    for (int32_t i = 0; i < theCount; ++i)
      theOut[i] = theValid[i] != 0 ? theStretch.mLut->level(theValues[i]) : CTLRX_TIFF_NULL_LEVEL;
    return;
  }
  if (theStretch.mShape == ETLRXStretchShape::kClass) {
    const double aTop = theStretch.mLevels + 0.5;
    for (int32_t i = 0; i < theCount; ++i) {
      const double aValue = theValues[i];
      const bool aHasLevel = theValid[i] != 0 && aValue >= -0.5 && aValue < aTop;
      theOut[i] = aHasLevel ? static_cast<uint8_t>(std::floor(aValue + 0.5)) : CTLRX_TIFF_NULL_LEVEL;
    }
    return;
  }
  if (theStretch.mShape == ETLRXStretchShape::kWrap) {
    const double aCycle = theStretch.mLevels + 1.0;
    for (int32_t i = 0; i < theCount; ++i) {
      const double aLevel = std::floor(theStretch.mScale * (theValues[i] - theStretch.mOrigin) + 0.5);
      const double aWrapped = aLevel - aCycle * std::floor(aLevel / aCycle);
      theOut[i] = theValid[i] != 0 ? static_cast<uint8_t>(std::min(aWrapped, aCycle - 1.0)) : CTLRX_TIFF_NULL_LEVEL;
    }
    return;
  }
  const double aExponent = theStretch.mExponent;
  if (aExponent == 1.0)
    clipLine(theStretch, theValues, theValid, theCount, theOut, [](double theD) { return theD; });
  else if (aExponent == 0.5)
    clipLine(theStretch, theValues, theValid, theCount, theOut, [](double theD) { return std::sqrt(theD); });
  else
    clipLine(theStretch, theValues, theValid, theCount, theOut,
             [aExponent](double theD) { return std::pow(theD, aExponent); });
}

// ------------------------------------------------------ block reduction

CTiffBlockReducer::CTiffBlockReducer(ETLRXBlockRule theRule, int32_t theOutCols, int32_t theColFactor)
    : mRule(theRule), mOutCols(theOutCols), mColFactor(theColFactor), mSums(static_cast<size_t>(theOutCols), 0.0),
      mCounts(static_cast<size_t>(theOutCols), 0) {}

void CTiffBlockReducer::startBlock() {
  std::fill(mSums.begin(), mSums.end(), 0.0);
  std::fill(mCounts.begin(), mCounts.end(), 0);
}

void CTiffBlockReducer::addRow(const double *theValues, const uint8_t *theValid) {
  if (mRule == ETLRXBlockRule::kCentre) {
    const int32_t aCentre = mColFactor / 2;
    for (int32_t j = 0; j < mOutCols; ++j) {
      const size_t aCell = static_cast<size_t>(j) * static_cast<size_t>(mColFactor) + static_cast<size_t>(aCentre);
      mSums[static_cast<size_t>(j)] = theValues[aCell];
      mCounts[static_cast<size_t>(j)] = theValid[aCell] != 0 ? 1 : 0;
    }
    return;
  }
  size_t aCell = 0;
  for (int32_t j = 0; j < mOutCols; ++j) {
    double aSum = 0.0;
    int64_t aCount = 0;
    for (int32_t c = 0; c < mColFactor; ++c, ++aCell) {
      if (theValid[aCell] != 0) {
        aSum += theValues[aCell];
        ++aCount;
      }
    }
    mSums[static_cast<size_t>(j)] += aSum;
    mCounts[static_cast<size_t>(j)] += aCount;
  }
}

void CTiffBlockReducer::finishBlock(double *theValues, uint8_t *theValid) const {
  for (int32_t j = 0; j < mOutCols; ++j) {
    const int64_t aCount = mCounts[static_cast<size_t>(j)];
    theValid[j] = aCount > 0 ? 1 : 0;
    theValues[j] = aCount > 1 ? mSums[static_cast<size_t>(j)] / static_cast<double>(aCount)
                              : mSums[static_cast<size_t>(j)];
  }
}
