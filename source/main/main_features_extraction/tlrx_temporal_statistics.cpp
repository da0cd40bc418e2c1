#include "tlrx_temporal_statistics.h"

#include <algorithm>
#include <array>
#include <cfloat>
#include <cmath>
#include <limits>
#include <utility>

namespace {

constexpr double CTLRX_NULL_TOLERANCE = 1.1754943508222875e-38;
constexpr double CTLRX_FLOAT_MAX = 3.4028234663852886e+38;
constexpr double CTLRX_RESCALE_LIMIT = 1e14; // as in CTemporalAccumulator::scaledAdd
// Series up to this length sort with a network for the median.
constexpr int32_t CTLRX_NETWORK_LIMIT = 32;
// Pixels per block of fully kept series (see SBlock), and the longest
// series that blocks take.
constexpr int32_t CTLRX_BLOCK_SIZE = 256;
constexpr int32_t CTLRX_BLOCK_INPUTS = 64;
constexpr double CTLRX_BLOCK_SMALLEST = 1e-15;
// Rows of SBlock::mState.
enum EBlockState { CTLRX_BS_SUM, CTLRX_BS_SQUARES, CTLRX_BS_BEST, CTLRX_BS_BEST_AT, CTLRX_BS_LOWEST,
                   CTLRX_BS_LOWEST_AT, CTLRX_BS_ROWS };

// Features defined only from two kept samples on.
const bool theNeedsTwo[CTLRX_TF_VALUE_COUNT] = {false, true,  false, true, false, false,
                                                false, true,  true,  false, true, true};

// Double to float, infinite beyond the float range (a plain conversion of
// such a value is undefined).
inline float fdfToFloat(double theValue) {
  if (theValue > CTLRX_FLOAT_MAX)
    return std::numeric_limits<float>::infinity();
  if (theValue < -CTLRX_FLOAT_MAX)
    return -std::numeric_limits<float>::infinity();
  return static_cast<float>(theValue);
}

// Comparisons with NaN bounds are false, so a NaN null value leaves only the
// NaN test.
inline bool fdfInInterval(double theValue, double theLow, double theHigh) {
  return theValue >= theLow && theValue <= theHigh;
}

// Whether (theValue / theLast) / theDays < theThreshold, as those divisions
// and that comparison decide it, NaN, infinities and zeros included. Far
// from the limit a product decides without dividing; within a few units in
// the last place of it, or where the product leaves the normal range, the
// divisions themselves do.
inline bool fdfBelowRatePerDay(double theValue, double theLast, double theDays, double theThreshold) {
  constexpr double aMargin = 1e-15;
  const double aPerDay = theThreshold * theDays;
  const double aLimit = aPerDay * theLast;
  if (aPerDay >= DBL_MIN && aPerDay <= DBL_MAX && aLimit >= DBL_MIN && aLimit <= DBL_MAX) {
    if (theValue < aLimit * (1.0 - aMargin))
      return true;
    if (theValue > aLimit * (1.0 + aMargin))
      return false;
  }
  return (theValue / theLast) / theDays < theThreshold;
}

// Median (lower median for an even count) of a few values through the
// compare-exchanges of Batcher's odd-even merge sort. With the count known
// at compile time the network unrolls into branch-free minima and maxima on
// registers, several times faster than a general selection, whose branches
// the random order of one pixel's values keeps mispredicting.
struct SExchange {
  int mLow, mHigh;
};

constexpr int fdfBatcher(int theCount, SExchange *theOut) {
  int aSize = 0;
  for (int p = 1; p < theCount; p *= 2)
    for (int k = p; k >= 1; k /= 2)
      for (int j = k % p; j + k < theCount; j += 2 * k)
        for (int i = 0; i < k && i < theCount - j - k; ++i)
          if ((i + j) / (2 * p) == (i + j + k) / (2 * p)) {
            if (theOut != nullptr)
              theOut[aSize] = {i + j, i + j + k};
            ++aSize;
          }
  return aSize;
}

template <int N>
struct SBatcherNetwork {
  static constexpr int CSize = fdfBatcher(N, nullptr);
  SExchange mPairs[CSize > 0 ? CSize : 1] = {};
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
  return fdfNetworkMedian<N>(theValues, std::make_index_sequence<SBatcherNetwork<N>::CSize>());
}

using TLRXMedian = double (*)(const double *);
template <int... N>
constexpr std::array<TLRXMedian, sizeof...(N)> fdfMedianTable(std::integer_sequence<int, N...>) {
  return {&fdfNetworkMedian<N + 1>...};
}
// Networks for 1 .. CTLRX_NETWORK_LIMIT values, entry n - 1 for n values.
constexpr auto theMedianNetworks = fdfMedianTable(std::make_integer_sequence<int, CTLRX_NETWORK_LIMIT>());

} // namespace

void CTemporalAccumulator::reset(double theNull) {
  mSum = mSquares = 0.0;
  mSumScale = mSquaresScale = 1.0;
  mNull = theNull;
  mNullLow = theNull - CTLRX_NULL_TOLERANCE;
  mNullHigh = theNull + CTLRX_NULL_TOLERANCE;
  mNullIsNaN = std::isnan(theNull);
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
    mBlock.mState.resize(static_cast<size_t>(CTLRX_BS_ROWS) * CTLRX_BLOCK_SIZE);
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
    mInputs.push_back({theNulls[i] - CTLRX_NULL_TOLERANCE, theNulls[i] + CTLRX_NULL_TOLERANCE,
                       static_cast<double>(theDays[i]), static_cast<int32_t>(theDays[i] - theDays[0])});
}

int32_t CTemporalSeries::select(const double *theValues, size_t theStride) {
  int32_t k = 0;
  double aLast = 0.0, aLastDay = 0.0, aLargest = 0.0;
  const size_t aInputs = mInputs.size();
  for (size_t i = 0; i < aInputs; ++i) {
    const SInputTerms &aInput = mInputs[i];
    double v = theValues[i * theStride];
    // Not a number carries no measurement, whatever the null value.
    if (std::isnan(v) || fdfInInterval(v, aInput.mNullLow, aInput.mNullHigh))
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
    return theMedianNetworks[mKept - 1](mValue.data());
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
    const bool aDefined = f == CTLRX_TF_STD ? aHasStd : aPairs || !theNeedsTwo[f];
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

void CTemporalSeries::gatherBlock(const double *theRows, size_t theStride) {
  const int32_t n = static_cast<int32_t>(mInputs.size());
  const int32_t M = mBlock.mCount;
  constexpr int32_t B = CTLRX_BLOCK_SIZE;
  double *__restrict aDoubt = mBlock.mDoubt.data();
  // Scratch rows until computeBlock.
  double *__restrict aLargest = mBlock.mState.data() + CTLRX_BS_SUM * B;
  double *__restrict aSmallest = mBlock.mState.data() + CTLRX_BS_SQUARES * B;
  const double aNullLow = mSettings.mNull - CTLRX_NULL_TOLERANCE, aNullHigh = mSettings.mNull + CTLRX_NULL_TOLERANCE;
  std::fill(aDoubt, aDoubt + M, 0.0);
  std::fill(aLargest, aLargest + M, 0.0);
  std::fill(aSmallest, aSmallest + M, std::numeric_limits<double>::infinity());
  for (int32_t j = 0; j < n; ++j) {
    const double *__restrict aRow = theRows + static_cast<size_t>(j) * theStride;
    double *__restrict aNow = mBlock.mValues.data() + static_cast<size_t>(j) * B;
    const double aLow = mInputs[j].mNullLow, aHigh = mInputs[j].mNullHigh;
    for (int32_t m = 0; m < M; ++m) {
      const double r = aRow[m];
      const double a = std::fabs(r);
      aNow[m] = a;
      const bool aNoData = (r != r) | ((r >= aLow) & (r <= aHigh));
      const bool aNullValued = (a >= aNullLow) & (a <= aNullHigh);
      aDoubt[m] += aNoData | aNullValued ? 1.0 : 0.0;
      aLargest[m] = std::max(aLargest[m], a);
      aSmallest[m] = std::min(aSmallest[m], a);
    }
    if (j == 0)
      continue;
    // Kept after the previous sample, surely: far below the rate limit (the
    // selection decides the cases near it).
    constexpr double aMargin = 1e-15;
    const double aPerDay = mSettings.mRatioTimeThreshold * (mInputs[j].mDay - mInputs[j - 1].mDay);
    const double *__restrict aBefore = aNow - B;
    if (!(aPerDay >= DBL_MIN && aPerDay <= DBL_MAX)) {
      std::fill(aDoubt, aDoubt + M, 1.0);
      continue;
    }
    for (int32_t m = 0; m < M; ++m) {
      const double aLimit = aPerDay * aBefore[m];
      const bool aSure = (aLimit >= DBL_MIN) & (aLimit <= DBL_MAX) & (aNow[m] < aLimit * (1.0 - aMargin));
      aDoubt[m] += aSure ? 0.0 : 1.0;
    }
  }
  // Sums that could reach the rescaling limit (or samples that are not
  // finite) need the accumulator's own steps. Samples from
  // CTLRX_BLOCK_SMALLEST to the limit's square root keep every feature
  // finite and within the float range (ratios and normalised values below
  // 1e37), so blocks store them by plain conversion.
  const double aInputs = n;
  for (int32_t m = 0; m < M; ++m) {
    aDoubt[m] += aInputs * std::max(aLargest[m], aLargest[m] * aLargest[m]) <= CTLRX_RESCALE_LIMIT ? 0.0 : 1.0;
    aDoubt[m] += aSmallest[m] >= CTLRX_BLOCK_SMALLEST ? 0.0 : 1.0;
  }
  // The block computes the pixels in doubt too, on a harmless series of
  // ones, so that every result of the block lies within the float range.
  for (int32_t j = 0; j < n; ++j) {
    double *__restrict aNow = mBlock.mValues.data() + static_cast<size_t>(j) * B;
    for (int32_t m = 0; m < M; ++m)
      aNow[m] = aDoubt[m] > 0.0 ? 1.0 : aNow[m];
  }
}

void CTemporalSeries::computeBlock() {
  const int32_t n = static_cast<int32_t>(mInputs.size());
  const int32_t M = mBlock.mCount;
  constexpr int32_t B = CTLRX_BLOCK_SIZE;
  const double aNull = mSettings.mNull;
  const double *V = mBlock.mValues.data();
  double *aState = mBlock.mState.data();
  double *__restrict S = aState + CTLRX_BS_SUM * B;
  double *__restrict Q = aState + CTLRX_BS_SQUARES * B;
  // The running extremes are features themselves: kept in their rows.
  double *F = mBlock.mFeatures.data();
  double *__restrict aMin = F + CTLRX_TF_MIN * B;
  double *__restrict aMax = F + CTLRX_TF_MAX * B;
  double *__restrict aUp = F + CTLRX_TF_MAX_INCREMENT * B;
  double *__restrict aDown = F + CTLRX_TF_MAX_DECREMENT * B;
  double *__restrict aSteepest = F + CTLRX_TF_GRADIENT * B;
  double *__restrict aRatioUp = F + CTLRX_TF_MAX_RATIO * B;
  double *__restrict aRatioDown = F + CTLRX_TF_MIN_RATIO * B;
  double *__restrict aBest = aState + CTLRX_BS_BEST * B;
  double *__restrict aBestAt = aState + CTLRX_BS_BEST_AT * B;
  double *__restrict aLowest = aState + CTLRX_BS_LOWEST * B;
  double *__restrict aLowestAt = aState + CTLRX_BS_LOWEST_AT * B;
  const double aInf = std::numeric_limits<double>::infinity();
  // Accumulator and running quantities, sample after sample as in
  // features(). Block samples are finite, not negative and never the null
  // value, so the sums take every one of them. Selects of the form
  // "c ? x : 0" keep the loops free of branches, so they vectorise.
  for (int32_t m = 0; m < M; ++m) {
    const double v = V[m];
    S[m] = v;
    Q[m] = v * v;
    aMin[m] = aMax[m] = v;
    aUp[m] = aRatioUp[m] = -aInf;
    aDown[m] = aRatioDown[m] = aInf;
    aSteepest[m] = 0.0;
  }
  for (int32_t j = 1; j < n; ++j) {
    const double *__restrict aNow = V + static_cast<size_t>(j) * B;
    const double *__restrict aBefore = aNow - B;
    for (int32_t m = 0; m < M; ++m) {
      const double v = aNow[m];
      S[m] += v;
      Q[m] += v * v;
      aMin[m] = std::min(aMin[m], v);
      aMax[m] = std::max(aMax[m], v);
      const double aStep = v - aBefore[m];
      const double aRatio = v / aBefore[m];
      aUp[m] = std::max(aUp[m], aStep);
      aDown[m] = std::min(aDown[m], aStep);
      aSteepest[m] = std::max(aSteepest[m], std::fabs(aStep));
      aRatioUp[m] = std::max(aRatioUp[m], aRatio);
      aRatioDown[m] = std::min(aRatioDown[m], aRatio);
    }
  }
  // Positions of the first largest sample and of the first smallest before
  // it, as computeDates() finds them. Each pass compares with quantities it
  // does not change, which keeps it vectorisable; walking the samples
  // backwards, the last match is the first position. The smallest before
  // the largest is the running minimum (from the starting bound) taken at
  // the sample before it, and its first occurrence lies before the largest.
  double *__restrict aRunning = aLowestAt;
  for (int32_t m = 0; m < M; ++m) {
    aBest[m] = aMax[m];
    aBestAt[m] = -1.0;
    aLowest[m] = CTLRX_FLOAT_MAX;
    aRunning[m] = CTLRX_FLOAT_MAX;
  }
  for (int32_t j = n - 1; j >= 0; --j) {
    const double *__restrict aNow = V + static_cast<size_t>(j) * B;
    const double aAt = j;
    for (int32_t m = 0; m < M; ++m)
      aBestAt[m] = aNow[m] == aBest[m] ? aAt : aBestAt[m];
  }
  for (int32_t j = 0; j + 1 < n; ++j) {
    const double *__restrict aNow = V + static_cast<size_t>(j) * B;
    const double aNext = j + 1;
    for (int32_t m = 0; m < M; ++m) {
      aRunning[m] = std::min(aRunning[m], aNow[m]);
      aLowest[m] = aNext == aBestAt[m] ? aRunning[m] : aLowest[m];
    }
  }
  for (int32_t m = 0; m < M; ++m)
    aLowestAt[m] = -1.0;
  for (int32_t j = n - 1; j >= 0; --j) {
    const double *__restrict aNow = V + static_cast<size_t>(j) * B;
    const double aAt = j;
    for (int32_t m = 0; m < M; ++m)
      aLowestAt[m] = aNow[m] == aLowest[m] ? aAt : aLowestAt[m];
  }
  // Nothing before the largest below the starting bound: no position.
  for (int32_t m = 0; m < M; ++m)
    aLowestAt[m] = aLowest[m] < CTLRX_FLOAT_MAX ? aLowestAt[m] : -1.0;
  double *__restrict aMean = F + CTLRX_TF_MEAN * B;
  double *__restrict aStd = F + CTLRX_TF_STD * B;
  double *__restrict aSpan = F + CTLRX_TF_SPAN_DIFFERENCE * B;
  double *__restrict aSpanRatio = F + CTLRX_TF_SPAN_RATIO * B;
  const double aCount = n;
  for (int32_t m = 0; m < M; ++m) {
    // As CTemporalAccumulator: sum / count times a scale of 1.
    aMean[m] = S[m] / aCount;
    aStd[m] = Q[m] / aCount - aMean[m] * aMean[m]; // the variance, for now
    aSpan[m] = aMax[m] - aMin[m];
    aSpanRatio[m] = aMax[m] / aMin[m];
  }
  if (mSettings.mWanted[CTLRX_TF_STD])
    for (int32_t m = 0; m < M; ++m)
      aStd[m] = aStd[m] > 0.0 ? std::sqrt(aStd[m]) : 0.0;
  else
    std::fill(aStd, aStd + M, aNull);
  if (mSettings.mWanted[CTLRX_TF_MEDIAN]) {
    double *W = mBlock.mSorted.data();
    std::copy(V, V + static_cast<size_t>(n) * B, W);
    for (size_t p = 0; p < mBlock.mNetwork.size(); p += 2) {
      double *__restrict aLow = W + static_cast<size_t>(mBlock.mNetwork[p]) * B;
      double *__restrict aHigh = W + static_cast<size_t>(mBlock.mNetwork[p + 1]) * B;
      for (int32_t m = 0; m < M; ++m) {
        const double aSmaller = std::min(aLow[m], aHigh[m]);
        aHigh[m] = std::max(aLow[m], aHigh[m]);
        aLow[m] = aSmaller;
      }
    }
    const double *aMiddle = W + static_cast<size_t>((n - 1) / 2) * B;
    for (int32_t m = 0; m < M; ++m)
      F[CTLRX_TF_MEDIAN * B + m] = n == 2 ? (V[m] + V[B + m]) / 2.0 : aMiddle[m];
  } else {
    std::fill(F + CTLRX_TF_MEDIAN * B, F + CTLRX_TF_MEDIAN * B + M, aNull);
  }
  // Modifiers, value by value as in features() (every value is defined
  // here, the mean included).
  for (int f : mModified)
    for (int32_t m = 0; m < M; ++m) {
      double x = F[f * B + m];
      if (mSettings.mNormalize && f != CTLRX_TF_MEDIAN)
        x /= F[CTLRX_TF_MEAN * B + m];
      if (mSettings.mDecibels)
        x = 10.0 * std::log10(x);
      F[f * B + m] = x;
    }
  int32_t *D = mBlock.mDates.data();
  for (int32_t m = 0; m < M; ++m) {
    const int32_t aBestInput = static_cast<int32_t>(aBestAt[m]);
    const int32_t aLowestInput = static_cast<int32_t>(aLowestAt[m]);
    D[m] = aBestInput >= 0 ? mInputs[aBestInput].mFromReference : CTLRX_TF_NO_DATE;
    D[B + m] = aLowestInput >= 0 ? mInputs[aLowestInput].mFromReference : CTLRX_TF_NO_DATE;
  }
}

void CTemporalSeries::line(const double *theRows, int32_t thePixels, const STemporalLines &theLines) {
  // The written features as a short table, so the pixel loops do not look
  // at the ones left out.
  int aFeatures[CTLRX_TF_VALUE_COUNT];
  float *aValueLines[CTLRX_TF_VALUE_COUNT];
  int aWritten = 0;
  for (int f = 0; f < CTLRX_TF_VALUE_COUNT; ++f)
    if (theLines.mValue[f] != nullptr) {
      aFeatures[aWritten] = f;
      aValueLines[aWritten++] = theLines.mValue[f];
    }
  double aValues[CTLRX_TF_VALUE_COUNT];
  int32_t aDates[2];
  const size_t aStride = static_cast<size_t>(thePixels);
  const auto aOnePixel = [&](int32_t x) {
    select(theRows + x, aStride);
    features(aValues, aDates);
    for (int j = 0; j < aWritten; ++j)
      aValueLines[j][x] = fdfToFloat(aValues[aFeatures[j]]);
    for (int d = 0; d < 2; ++d)
      if (theLines.mDate[d] != nullptr)
        theLines.mDate[d][x] = aDates[d];
  };
  if (mBlock.mValues.empty()) {
    for (int32_t x = 0; x < thePixels; ++x)
      aOnePixel(x);
    return;
  }
  // Runs of pixels computed together; the pixels the block cannot take for
  // sure are then done one by one, over the block's results.
  for (int32_t x0 = 0; x0 < thePixels; x0 += CTLRX_BLOCK_SIZE) {
    const int32_t M = std::min(CTLRX_BLOCK_SIZE, thePixels - x0);
    mBlock.mCount = M;
    gatherBlock(theRows + x0, aStride);
    computeBlock();
    // Every block result lies within the float range (gatherBlock): a plain
    // conversion. The pixels in doubt are overwritten below.
    for (int j = 0; j < aWritten; ++j) {
      const double *__restrict aBlock = &mBlock.mFeatures[static_cast<size_t>(aFeatures[j]) * CTLRX_BLOCK_SIZE];
      float *__restrict aLine = aValueLines[j] + x0;
      for (int32_t m = 0; m < M; ++m)
        aLine[m] = static_cast<float>(aBlock[m]);
    }
    for (int d = 0; d < 2; ++d)
      if (theLines.mDate[d] != nullptr)
        std::copy(&mBlock.mDates[static_cast<size_t>(d) * CTLRX_BLOCK_SIZE],
                  &mBlock.mDates[static_cast<size_t>(d) * CTLRX_BLOCK_SIZE] + M, theLines.mDate[d] + x0);
    for (int32_t m = 0; m < M; ++m)
      if (mBlock.mDoubt[m] != 0.0)
        aOnePixel(x0 + m);
  }
}
