#include "tlrx_temporal_statistics.h"

#include <algorithm>
#include <cmath>
#include <limits>

namespace {

constexpr double CTLRX_NULL_TOLERANCE = 1.1754943508222875e-38;
constexpr double CTLRX_RESCALE_LIMIT = 1e14;
constexpr double CTLRX_FLOAT_MAX = 3.4028234663852886e+38;

// Features scaled by the modifiers: normalisation spares the mean and the
// median, decibels only the mean.
const ETemporalFeature theNormalised[] = {CTLRX_TF_STD,          CTLRX_TF_GRADIENT,      CTLRX_TF_MAX,
                                          CTLRX_TF_MIN,          CTLRX_TF_SPAN_DIFFERENCE, CTLRX_TF_MAX_INCREMENT,
                                          CTLRX_TF_MAX_DECREMENT, CTLRX_TF_SPAN_RATIO,   CTLRX_TF_MAX_RATIO,
                                          CTLRX_TF_MIN_RATIO};

// The no-data interval; comparisons with a NaN bound are false, so a NaN
// null value leaves only the NaN test.
struct SNullTest {
  double mLow, mHigh;
  explicit SNullTest(double theNull) : mLow(theNull - CTLRX_NULL_TOLERANCE), mHigh(theNull + CTLRX_NULL_TOLERANCE) {}
  bool matches(double theValue, bool theNaNMatches) const {
    return (theNaNMatches && std::isnan(theValue)) || (theValue >= mLow && theValue <= mHigh);
  }
};

// One running sum with its power-of-ten scale.
void fdfScaledAdd(double &theSum, double &theScale, double theValue) {
  if (theSum > CTLRX_RESCALE_LIMIT) {
    theScale *= 10.0;
    theSum = 0.1 * theSum + theValue / theScale;
  } else {
    theSum += theValue / theScale;
  }
}

} // namespace

void CTemporalAccumulator::reset(double theNull) {
  mSum = mSquares = 0.0;
  mSumScale = mSquaresScale = 1.0;
  mNull = theNull;
  mCount = 0;
}

void CTemporalAccumulator::add(double theValue) {
  if (SNullTest(mNull).matches(theValue, std::isnan(mNull)))
    return;
  fdfScaledAdd(mSum, mSumScale, theValue);
  fdfScaledAdd(mSquares, mSquaresScale, theValue * theValue);
  ++mCount;
}

double CTemporalAccumulator::mean() const { return mCount < 1 ? mNull : mSum / mCount * mSumScale; }

double CTemporalAccumulator::std() const {
  if (mCount < 1)
    return mNull;
  const double aMean = mSum / mCount * mSumScale;
  const double aVariance = mSquares / mCount * mSquaresScale - aMean * aMean;
  // Cancellation can leave a tiny negative variance for a constant series.
  if (aVariance > 0.0)
    return std::sqrt(aVariance);
  return aVariance <= 0.0 ? 0.0 : aVariance;
}

CTemporalSeries::CTemporalSeries(const STemporalSettings &theSettings, const std::vector<long> &theDays,
                                 const std::vector<double> &theNulls)
    : mSettings(theSettings), mDays(theDays), mNulls(theNulls), mValue(theDays.size()), mDay(theDays.size()),
      mScratch(theDays.size()) {}

int32_t CTemporalSeries::select(const double *theValues, size_t theStride) {
  mKept = 0;
  double aLast = 0.0;
  long aLastDay = 0;
  const size_t aInputs = mDays.size();
  for (size_t i = 0; i < aInputs; ++i) {
    double v = theValues[i * theStride];
    // Not a number carries no measurement, whatever the null value.
    if (SNullTest(mNulls[i]).matches(v, true))
      continue;
    v = std::fabs(v);
    if (mKept > 0 && !((v / aLast) / static_cast<double>(mDays[i] - aLastDay) < mSettings.mRatioTimeThreshold))
      continue;
    mValue[mKept] = v;
    mDay[mKept] = static_cast<int32_t>(mDays[i] - mDays[0]);
    ++mKept;
    aLast = v;
    aLastDay = mDays[i];
  }
  return mKept;
}

double CTemporalSeries::median() {
  if (mKept == 1)
    return mValue[0];
  if (mKept == 2)
    return (mValue[0] + mValue[1]) / 2.0;
  std::copy(mValue.begin(), mValue.begin() + mKept, mScratch.begin());
  const auto aMiddle = mScratch.begin() + (mKept - 1) / 2;
  std::nth_element(mScratch.begin(), aMiddle, mScratch.begin() + mKept);
  return *aMiddle;
}

void CTemporalSeries::computeDates(int32_t theDates[2]) const {
  int32_t aMax = -1;
  double aBest = -CTLRX_FLOAT_MAX;
  for (int32_t j = 0; j < mKept; ++j)
    if (mValue[j] > aBest) {
      aBest = mValue[j];
      aMax = j;
    }
  if (aMax < 0)
    return;
  theDates[0] = mDay[aMax];
  int32_t aMin = -1;
  double aLowest = CTLRX_FLOAT_MAX;
  for (int32_t j = 0; j < aMax; ++j)
    if (mValue[j] < aLowest) {
      aLowest = mValue[j];
      aMin = j;
    }
  if (aMin >= 0)
    theDates[1] = mDay[aMin];
}

void CTemporalSeries::features(double theValues[CTLRX_TF_VALUE_COUNT], int32_t theDates[2]) {
  const double aNull = mSettings.mNull;
  std::fill(theValues, theValues + CTLRX_TF_VALUE_COUNT, aNull);
  theDates[0] = theDates[1] = CTLRX_TF_NO_DATE;
  const int32_t k = mKept;
  if (k == 0)
    return;
  mAccumulator.reset(aNull);
  double aMin = mValue[0], aMax = mValue[0];
  double aUp = -std::numeric_limits<double>::infinity(), aDown = std::numeric_limits<double>::infinity();
  double aSteepest = 0.0;
  double aRatioUp = -std::numeric_limits<double>::infinity(), aRatioDown = std::numeric_limits<double>::infinity();
  for (int32_t j = 0; j < k; ++j) {
    const double v = mValue[j];
    mAccumulator.add(v);
    aMin = std::min(aMin, v);
    aMax = std::max(aMax, v);
    if (j == 0)
      continue;
    const double aStep = v - mValue[j - 1];
    const double aRatio = v / mValue[j - 1];
    aUp = std::max(aUp, aStep);
    aDown = std::min(aDown, aStep);
    aSteepest = std::max(aSteepest, std::fabs(aStep));
    aRatioUp = std::max(aRatioUp, aRatio);
    aRatioDown = std::min(aRatioDown, aRatio);
  }
  const double aMean = mAccumulator.mean();
  // Without a sample in the accumulator there is no mean to scale by.
  const bool aHasMean = mAccumulator.count() > 0;
  bool aSet[CTLRX_TF_VALUE_COUNT] = {};
  auto aPut = [&](ETemporalFeature theFeature, double theValue) {
    theValues[theFeature] = theValue;
    aSet[theFeature] = true;
  };
  aPut(CTLRX_TF_MEAN, aMean);
  if (mSettings.mWanted[CTLRX_TF_MEDIAN])
    aPut(CTLRX_TF_MEDIAN, median());
  aPut(CTLRX_TF_MAX, aMax);
  aPut(CTLRX_TF_MIN, aMin);
  aPut(CTLRX_TF_SPAN_DIFFERENCE, aMax - aMin);
  aPut(CTLRX_TF_SPAN_RATIO, aMax / aMin);
  if (k > 1) {
    aPut(CTLRX_TF_MAX_INCREMENT, aUp);
    aPut(CTLRX_TF_MAX_DECREMENT, aDown);
    aPut(CTLRX_TF_MAX_RATIO, aRatioUp);
    aPut(CTLRX_TF_MIN_RATIO, aRatioDown);
    aPut(CTLRX_TF_GRADIENT, aSteepest);
    if (aHasMean)
      aPut(CTLRX_TF_STD, mAccumulator.std());
  }
  if (mSettings.mNormalize)
    for (ETemporalFeature aFeature : theNormalised) {
      if (!aSet[aFeature] || !mSettings.mWanted[aFeature])
        continue;
      if (aHasMean) {
        theValues[aFeature] /= aMean;
      } else {
        theValues[aFeature] = aNull;
        aSet[aFeature] = false;
      }
    }
  if (mSettings.mDecibels)
    for (int f = CTLRX_TF_STD; f < CTLRX_TF_VALUE_COUNT; ++f)
      if (aSet[f] && mSettings.mWanted[f])
        theValues[f] = 10.0 * std::log10(theValues[f]);
  if (mSettings.mWanted[CTLRX_TF_DATE_MAX] || mSettings.mWanted[CTLRX_TF_DATE_MIN_BEFORE_MAX])
    computeDates(theDates);
}
