#include "tlrx_temporal_statistics.h"

#include "tlrx_temporal_detail.h"

#include <algorithm>
#include <array>
#include <cfloat>
#include <cmath>
#include <limits>
#include <utility>

namespace {

using namespace tlrx_temporal_detail;

// Series up to this length sort with a network for the median.
constexpr int32_t CTLRX_NETWORK_LIMIT = 32;

// Features defined only from two kept samples on.
const bool sNeedsTwo[CTLRX_TF_VALUE_COUNT] = {false, true,  false, true, false, false,
                                                false, true,  true,  false, true, true};

// Whether (theValue / theLast) / theDays < theThreshold, as those divisions
// and that comparison decide it, NaN, infinities and zeros included. Far
// from the limit a product decides without dividing; within a few units in
// the last place of it, or where the product leaves the normal range, the
// divisions themselves do.
inline bool fdfBelowRatePerDay(double theValue, double theLast, double theDays, double theThreshold) {
  const double aPerDay = theThreshold * theDays;
  const double aLimit = aPerDay * theLast;
  if (aPerDay >= DBL_MIN && aPerDay <= DBL_MAX && aLimit >= DBL_MIN && aLimit <= DBL_MAX) {
    if (theValue < aLimit * (1.0 - CTLRX_RATE_MARGIN))
      return true;
    if (theValue > aLimit * (1.0 + CTLRX_RATE_MARGIN))
      return false;
  }
  return (theValue / theLast) / theDays < theThreshold;
}

// Median (lower median for an even count) of a few values through the
// compare-exchanges of Batcher's odd-even merge sort. With the count known
// at compile time the network unrolls into branch-free minima and maxima on
// registers, several times faster than a general selection, whose branches
// the random order of one pixel's values keeps mispredicting.
template <int N>
struct SBatcherNetwork {
  static constexpr int sSize = fdfBatcher(N, nullptr);
  SExchange mPairs[sSize > 0 ? sSize : 1] = {};
  constexpr SBatcherNetwork() { fdfBatcher(N, mPairs); }
};

template <int N, size_t... I>
double fdfNetworkMedian(const double *theValues, std::index_sequence<I...>) {
  constexpr SBatcherNetwork<N> aNetwork;
  double a[N];
  for (int i = 0; i < N; ++i)
    a[i] = theValues[i];
  [[maybe_unused]] auto aExchange = [&a](SExchange thePair) {
    const double aLow = std::min(a[thePair.mLow], a[thePair.mHigh]);
    a[thePair.mHigh] = std::max(a[thePair.mLow], a[thePair.mHigh]);
    a[thePair.mLow] = aLow;
  };
  (aExchange(aNetwork.mPairs[I]), ...);
  return a[(N - 1) / 2];
}

template <int N>
double fdfNetworkMedian(const double *theValues) {
  return fdfNetworkMedian<N>(theValues, std::make_index_sequence<SBatcherNetwork<N>::sSize>());
}

using TLRXMedian = double (*)(const double *);
template <int... N>
constexpr std::array<TLRXMedian, sizeof...(N)> fdfMedianTable(std::integer_sequence<int, N...>) {
  return {&fdfNetworkMedian<N + 1>...};
}
// Networks for 1 .. CTLRX_NETWORK_LIMIT values, entry n - 1 for n values.
constexpr auto sMedianNetworks = fdfMedianTable(std::make_integer_sequence<int, CTLRX_NETWORK_LIMIT>());

} // namespace

void CTemporalAccumulator::reset(double theNull) {
  mSum = mSquares = 0.0;
  mSumScale = mSquaresScale = 1.0;
  mNoData = SNoData(theNull);
  mCount = 0;
}

void CTemporalAccumulator::addAll(const double *theValues, int32_t theCount, double theLargest) {
  const double aBound = theCount * std::max(theLargest, theLargest * theLargest);
  if (!(aBound <= CTLRX_RESCALE_LIMIT) || mSumScale != 1.0 || mSquaresScale != 1.0 || mSum != 0.0 ||
      mSquares != 0.0) {
    for (int32_t j = 0; j < theCount; ++j)
      add(theValues[j]);
    return;
  }
  // Every partial sum stays below the limit: plain sums, in the same order,
  // in locals (the members could alias theValues for the compiler).
  double aSum = 0.0, aSquares = 0.0;
  int32_t aCount = 0;
  for (int32_t j = 0; j < theCount; ++j) {
    const double v = theValues[j];
    if (isNull(v))
      continue;
    aSum += v;
    aSquares += v * v;
    ++aCount;
  }
  mSum = aSum;
  mSquares = aSquares;
  mCount = aCount;
}

double CTemporalAccumulator::mean() const { return mCount < 1 ? mNoData.mNull : mSum / mCount * mSumScale; }

double CTemporalAccumulator::std() const {
  if (mCount < 1)
    return mNoData.mNull;
  const double aMean = mSum / mCount * mSumScale;
  const double aVariance = mSquares / mCount * mSquaresScale - aMean * aMean;
  // Cancellation can leave a tiny negative variance for a constant series.
  if (aVariance > 0.0)
    return std::sqrt(aVariance);
  return aVariance <= 0.0 ? 0.0 : aVariance;
}

CTemporalSeries::CTemporalSeries(const STemporalSettings &theSettings, const std::vector<long> &theDays,
                                 const std::vector<double> &theNulls)
    : mSettings(theSettings), mValue(theDays.size()), mRatio(theDays.size()), mDay(theDays.size()),
      mScratch(theDays.size()) {
  // The modifiers touch every wanted value but the mean; normalisation
  // also spares the median.
  if (mSettings.mNormalize || mSettings.mDecibels)
    for (int f = CTLRX_TF_STD; f < CTLRX_TF_VALUE_COUNT; ++f)
      if (mSettings.mWanted[f])
        mModified.push_back(f);
  const int32_t aInputs = static_cast<int32_t>(theDays.size());
  if (aInputs >= 2 && aInputs <= CTLRX_BLOCK_INPUTS) {
    const size_t aCells = static_cast<size_t>(aInputs) * CTLRX_BLOCK_SIZE;
    mBlock.mValues.resize(aCells);
    mBlock.mSorted.resize(aCells);
    mBlock.mState.resize(static_cast<size_t>(blockStateRows()) * CTLRX_BLOCK_SIZE);
    mBlock.mFeatures.resize(static_cast<size_t>(CTLRX_TF_VALUE_COUNT) * CTLRX_BLOCK_SIZE);
    mBlock.mDates.resize(2 * CTLRX_BLOCK_SIZE);
    mBlock.mDoubt.resize(CTLRX_BLOCK_SIZE);
    std::vector<SExchange> aNetwork(static_cast<size_t>(fdfBatcher(aInputs, nullptr)));
    fdfBatcher(aInputs, aNetwork.data());
    for (const SExchange &aPair : aNetwork) {
      mBlock.mNetwork.push_back(aPair.mLow);
      mBlock.mNetwork.push_back(aPair.mHigh);
    }
  }
  for (size_t i = 0; i < theDays.size(); ++i)
    mInputs.push_back({SNoData(theNulls[i]), static_cast<double>(theDays[i]),
                       static_cast<int32_t>(theDays[i] - theDays[0])});
}

int32_t CTemporalSeries::select(const double *theValues, size_t theStride) {
  int32_t k = 0;
  double aLast = 0.0, aLastDay = 0.0, aLargest = 0.0;
  const size_t aInputs = mInputs.size();
  for (size_t i = 0; i < aInputs; ++i) {
    const SInputTerms &aInput = mInputs[i];
    double v = theValues[i * theStride];
    // Temporal features drop a NaN as no data too: it carries no measurement,
    // whatever the null value.
    if (aInput.mNoData.isNullOrNaN(v))
      continue;
    v = std::fabs(v);
    if (k > 0 && !fdfBelowRatePerDay(v, aLast, aInput.mDay - aLastDay, mSettings.mRatioTimeThreshold))
      continue;
    mValue[k] = v;
    mDay[k] = aInput.mFromReference;
    ++k;
    aLast = v;
    aLastDay = aInput.mDay;
    aLargest = std::max(aLargest, v);
  }
  mKept = k;
  mLargest = aLargest;
  return k;
}

double CTemporalSeries::median() {
  if (mKept == 1)
    return mValue[0];
  if (mKept == 2)
    return (mValue[0] + mValue[1]) / 2.0;
  if (mKept <= CTLRX_NETWORK_LIMIT)
    return sMedianNetworks[mKept - 1](mValue.data());
  std::copy(mValue.begin(), mValue.begin() + mKept, mScratch.begin());
  const auto aMiddle = mScratch.begin() + (mKept - 1) / 2;
  std::nth_element(mScratch.begin(), aMiddle, mScratch.begin() + mKept);
  return *aMiddle;
}

// The searches are written as selects, not branches: the order of one
// pixel's values is random, and mispredicted branches would cost more than
// the comparisons.
void CTemporalSeries::computeDates(int32_t theDates[2]) const {
  int32_t aMax = -1;
  double aBest = -CTLRX_FLOAT_MAX;
  for (int32_t j = 0; j < mKept; ++j) {
    const bool aAbove = mValue[j] > aBest;
    aBest = aAbove ? mValue[j] : aBest;
    aMax = aAbove ? j : aMax;
  }
  if (aMax < 0)
    return;
  theDates[0] = mDay[aMax];
  int32_t aMin = -1;
  double aLowest = CTLRX_FLOAT_MAX;
  for (int32_t j = 0; j < aMax; ++j) {
    const bool aBelow = mValue[j] < aLowest;
    aLowest = aBelow ? mValue[j] : aLowest;
    aMin = aBelow ? j : aMin;
  }
  if (aMin >= 0)
    theDates[1] = mDay[aMin];
}

void CTemporalSeries::features(double theValues[CTLRX_TF_VALUE_COUNT], int32_t theDates[2]) {
  const double aNull = mSettings.mNull;
  theDates[0] = theDates[1] = CTLRX_TF_NO_DATE;
  const int32_t k = mKept;
  if (k == 0) {
    std::fill(theValues, theValues + CTLRX_TF_VALUE_COUNT, aNull);
    return;
  }
  // Independent divisions, kept out of the selection's dependent chain.
  for (int32_t j = 1; j < k; ++j)
    mRatio[j] = mValue[j] / mValue[j - 1];
  mAccumulator.reset(aNull);
  mAccumulator.addAll(mValue.data(), k, mLargest);
  double aPrevious = mValue[0];
  double aMin = aPrevious, aMax = aPrevious;
  double aUp = -std::numeric_limits<double>::infinity(), aDown = std::numeric_limits<double>::infinity();
  double aSteepest = 0.0;
  double aRatioUp = -std::numeric_limits<double>::infinity(), aRatioDown = std::numeric_limits<double>::infinity();
  for (int32_t j = 1; j < k; ++j) {
    const double v = mValue[j];
    aMin = std::min(aMin, v);
    aMax = std::max(aMax, v);
    const double aStep = v - aPrevious;
    const double aRatio = mRatio[j];
    aUp = std::max(aUp, aStep);
    aDown = std::min(aDown, aStep);
    aSteepest = std::max(aSteepest, std::fabs(aStep));
    aRatioUp = std::max(aRatioUp, aRatio);
    aRatioDown = std::min(aRatioDown, aRatio);
    aPrevious = v;
  }
  const double aMean = mAccumulator.mean();
  // Without a sample in the accumulator there is no mean to scale by.
  const bool aHasMean = mAccumulator.count() > 0;
  const bool aPairs = k > 1;
  theValues[CTLRX_TF_MEAN] = aMean;
  theValues[CTLRX_TF_MEDIAN] = mSettings.mWanted[CTLRX_TF_MEDIAN] ? median() : aNull;
  theValues[CTLRX_TF_MAX] = aMax;
  theValues[CTLRX_TF_MIN] = aMin;
  theValues[CTLRX_TF_SPAN_DIFFERENCE] = aMax - aMin;
  theValues[CTLRX_TF_SPAN_RATIO] = aMax / aMin;
  theValues[CTLRX_TF_MAX_INCREMENT] = aPairs ? aUp : aNull;
  theValues[CTLRX_TF_MAX_DECREMENT] = aPairs ? aDown : aNull;
  theValues[CTLRX_TF_MAX_RATIO] = aPairs ? aRatioUp : aNull;
  theValues[CTLRX_TF_MIN_RATIO] = aPairs ? aRatioDown : aNull;
  theValues[CTLRX_TF_GRADIENT] = aPairs ? aSteepest : aNull;
  const bool aHasStd = aPairs && aHasMean;
  theValues[CTLRX_TF_STD] = aHasStd && mSettings.mWanted[CTLRX_TF_STD] ? mAccumulator.std() : aNull;
  for (int f : mModified) {
    const bool aDefined = f == CTLRX_TF_STD ? aHasStd : aPairs || !sNeedsTwo[f];
    if (!aDefined)
      continue;
    double x = theValues[f];
    if (mSettings.mNormalize && f != CTLRX_TF_MEDIAN) {
      if (!aHasMean) {
        theValues[f] = aNull;
        continue;
      }
      x /= aMean;
    }
    if (mSettings.mDecibels)
      x = 10.0 * std::log10(x);
    theValues[f] = x;
  }
  if (mSettings.mWanted[CTLRX_TF_DATE_MAX] || mSettings.mWanted[CTLRX_TF_DATE_MIN_BEFORE_MAX])
    computeDates(theDates);
}
