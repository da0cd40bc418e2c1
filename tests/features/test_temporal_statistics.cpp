// Per-pixel temporal statistics: the accumulator against two-pass sums, and
// the selection and features on the series worth having in mind.
#include "tlrx_temporal_features.h"
#include "tlrx_temporal_statistics.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <random>
#include <vector>

namespace {

constexpr double sNaN = std::numeric_limits<double>::quiet_NaN();
constexpr double sN = -1.0; // output null value of these tests

struct SPixel {
  double mValues[CTLRX_TF_VALUE_COUNT];
  int32_t mDates[2];
  int32_t mKept;
  double operator[](int theFeature) const { return mValues[theFeature]; }
};

// Every feature wanted.
STemporalSettings settings(bool theNormalize, bool theDb, double theRatioTime, double theNull) {
  STemporalSettings aSettings;
  aSettings.mRatioTimeThreshold = theRatioTime;
  aSettings.mNormalize = theNormalize;
  aSettings.mDecibels = theDb;
  aSettings.mNull = theNull;
  std::fill(std::begin(aSettings.mWanted), std::end(aSettings.mWanted), true);
  return aSettings;
}

// Runs one pixel: theValues in temporal order on theDays, input nulls -1.
SPixel pixel(const std::vector<double> &theValues, const std::vector<long> &theDays, bool theNormalize = false,
             bool theDb = false, double theRatioTime = 1e100, double theNull = sN) {
  CTemporalSeries aSeries(settings(theNormalize, theDb, theRatioTime, theNull), theDays,
                          std::vector<double>(theValues.size(), -1.0));
  SPixel aPixel;
  aPixel.mKept = aSeries.select(theValues.data(), 1);
  aSeries.features(aPixel.mValues, aPixel.mDates);
  return aPixel;
}

} // namespace

// A long series of large values (squares of 3e9 pass 1e14 at once, sums
// after a few dozen values) against two-pass sums in long double: the
// one-pass variance cancels 1e19 against 1e19, checked to the digits left.
// Samples equal to the null value stay out (the series tests see them).
TEST(TemporalAccumulator, RescalingKeepsLongSeriesOfLargeValuesPrecise) {
  CTemporalAccumulator aAcc;
  aAcc.reset(0.0);
  long double aSum = 0, aSquares = 0;
  std::vector<double> aValues;
  for (int i = 0; i < 20000; ++i) {
    aValues.push_back(3e9 + 1e6 * std::sin(0.37 * i));
    aAcc.add(aValues.back());
    aSum += aValues.back();
  }
  const long double aMean = aSum / 20000;
  for (double v : aValues)
    aSquares += (v - aMean) * (v - aMean);
  EXPECT_EQ(aAcc.count(), 20000);
  EXPECT_NEAR(aAcc.mean() / static_cast<double>(aMean), 1.0, 1e-12);
  EXPECT_NEAR(aAcc.std(), std::sqrt(static_cast<double>(aSquares / 20000)), 2e4);
  // Nothing added: both give the null value, NaN included.
  aAcc.reset(-7.0);
  EXPECT_EQ(aAcc.mean(), -7.0);
  EXPECT_EQ(aAcc.std(), -7.0);
  aAcc.reset(sNaN);
  aAcc.add(sNaN);
  EXPECT_EQ(aAcc.count(), 0);
  EXPECT_TRUE(std::isnan(aAcc.mean()));
}

TEST(TemporalAccumulator, ConstantSeriesHasAZeroNotANegativeDeviation) {
  auto aDeviation = [](double theValue) {
    CTemporalAccumulator aAcc;
    aAcc.reset(-1.0);
    for (int i = 0; i < 7; ++i)
      aAcc.add(theValue);
    return aAcc.std();
  };
  // Seven equal values whose one-pass variance rounds below zero
  // (-1.4e-17 for 0.3, -2.4e-7 for 1e5 / 3): a deviation of 0, not the
  // negative variance.
  for (double v : {0.3, 0.7, 1e5 / 3.0, 13.7})
    EXPECT_EQ(aDeviation(v), 0.0) << v;
  // Others round above zero: a deviation of rounding size.
  for (double v : {0.1, 1.1, 2.9}) {
    EXPECT_GE(aDeviation(v), 0.0) << v;
    EXPECT_LT(aDeviation(v), 1e-7 * v) << v;
  }
}

// Every feature of small series: no data, one sample, magnitudes of negative
// values, NaN; normalised (mean and median spared) and in decibels (the mean
// spared; of a negative value NaN); samples equal to the output null value 5
// outside mean and deviation. Rejected: a later sample of the same day, any
// after a kept 0, 10 -> 40 over 4 days at 0.5 per day. Dates: the first of
// equal maxima, the first minimum before it, none before a first maximum.
TEST(TemporalSeries, FeaturesOfSmallSeries) {
  const double M = 18.75, S = std::sqrt(54.6875), aAll = 1e100;
  const int32_t aNone = CTLRX_TF_NO_DATE;
  auto dB = [](double theValue) { return 10 * std::log10(theValue); };
  const struct {
    std::vector<double> mValues;
    std::vector<long> mDays;
    bool mNormalize, mDb;
    double mNull, mRatioTime;
    int32_t mKept, mDates[2];
    double mWant[CTLRX_TF_VALUE_COUNT]; // mean, std, median, gradient, max, min, span difference,
                                        // max increment and decrement, span ratio, max and min ratio
  } aCases[] = {
      {{10, 20, 15, 30}, {100, 112, 124, 136}, false, false, sN, aAll, 4, {36, 0},
       {M, S, 15, 15, 30, 10, 20, 15, -5, 3, 2, 0.75}},
      {{-1, -1, sNaN}, {0, 5, 9}, true, true, sN, aAll, 0, {aNone, aNone},
       {sN, sN, sN, sN, sN, sN, sN, sN, sN, sN, sN, sN}},
      {{-1, 4.5, -1}, {0, 5, 9}, false, false, sN, aAll, 1, {5, aNone},
       {4.5, sN, 4.5, sN, 4.5, 4.5, 0, sN, sN, 1, sN, sN}},
      {{-1, 4.5, -1}, {0, 5, 9}, true, false, sN, aAll, 1, {5, aNone},
       {4.5, sN, 4.5, sN, 1, 1, 0, sN, sN, 1 / 4.5, sN, sN}},
      {{-1, 4.5, -1}, {0, 5, 9}, true, true, sN, aAll, 1, {5, aNone},
       {4.5, sN, dB(4.5), sN, 0, 0, -HUGE_VAL, sN, sN, dB(1 / 4.5), sN, sN}},
      {{-4, 2, sNaN, -8}, {0, 1, 2, 3}, false, false, sN, aAll, 3, {3, 1},
       {14.0 / 3, std::sqrt(56.0 / 9), 4, 6, 8, 2, 6, 6, -2, 4, 4, 0.5}},
      {{10, 20, 15, 30}, {0, 12, 24, 36}, true, false, sN, aAll, 4, {36, 0},
       {M, S / M, 15, 15 / M, 30 / M, 10 / M, 20 / M, 15 / M, -5 / M, 3 / M, 2 / M, 0.75 / M}},
      {{10, 20, 15, 30}, {0, 12, 24, 36}, true, true, sN, aAll, 4, {36, 0},
       {M, dB(S / M), dB(15), dB(15 / M), dB(30 / M), dB(10 / M), dB(20 / M), dB(15 / M), sNaN, dB(3 / M),
        dB(2 / M), dB(0.75 / M)}},
      {{2, -5, 8}, {0, 10, 20}, false, false, 5, aAll, 3, {20, 0}, {5, 3, 5, 3, 8, 2, 6, 3, 3, 4, 2.5, 1.6}},
      {{5, 5}, {0, 10}, true, false, 5, aAll, 2, {0, aNone}, {5, 5, 5, 5, 5, 5, 5, 5, 5, 5, 5, 5}},
      {{5, 5}, {0, 10}, false, false, 5, aAll, 2, {0, aNone}, {5, 5, 5, 0, 5, 5, 0, 0, 0, 1, 1, 1}},
      {{5, 0, 6}, {0, 0, 12}, false, false, sN, aAll, 2, {12, 0}, {5.5, 0.5, 5.5, 1, 6, 5, 1, 1, 1, 1.2, 1.2, 1.2}},
      {{3, 0, 4, 0}, {0, 10, 20, 30}, false, false, sN, aAll, 2, {0, aNone},
       {1.5, 1.5, 1.5, 3, 3, 0, 3, -3, -3, HUGE_VAL, 0, 0}},
      {{10, 40, 15}, {0, 4, 10}, false, false, sN, 0.5, 2, {10, 0},
       {12.5, 2.5, 12.5, 5, 15, 10, 5, 5, 5, 1.5, 1.5, 1.5}},
      {{4, 2, 9, 2, 9}, {0, 3, 6, 9, 12}, false, false, sN, aAll, 5, {6, 3},
       {5.2, std::sqrt(10.16), 4, 7, 9, 2, 7, 7, -7, 4.5, 4.5, 2.0 / 9}},
      {{9, 2}, {0, 3}, false, false, sN, aAll, 2, {0, aNone},
       {5.5, 3.5, 5.5, 7, 9, 2, 7, -7, -7, 4.5, 2.0 / 9, 2.0 / 9}},
  };
  for (size_t c = 0; c < sizeof aCases / sizeof aCases[0]; ++c) {
    const auto &aCase = aCases[c];
    SCOPED_TRACE("case " + std::to_string(c));
    const SPixel p = pixel(aCase.mValues, aCase.mDays, aCase.mNormalize, aCase.mDb, aCase.mRatioTime, aCase.mNull);
    EXPECT_EQ(p.mKept, aCase.mKept);
    for (int f = 0; f < CTLRX_TF_VALUE_COUNT; ++f) {
      const double aWant = aCase.mWant[f];
      if (std::isnan(aWant) || std::isinf(aWant))
        EXPECT_TRUE(std::isnan(aWant) ? std::isnan(p[f]) : p[f] == aWant) << "feature " << f << ": " << p[f];
      else
        EXPECT_NEAR(p[f], aWant, 1e-12 * std::max(1.0, std::fabs(aWant))) << "feature " << f;
    }
    EXPECT_EQ(p.mDates[0], aCase.mDates[0]);
    EXPECT_EQ(p.mDates[1], aCase.mDates[1]);
  }
  EXPECT_EQ(fdfMaxRatioThreshold(10), 10);
  EXPECT_DOUBLE_EQ(fdfMaxRatioTimeThreshold(20, 4), 25);
}

TEST(TemporalSeries, OnlyWantedFeaturesAreComputedAndStridedInputsAreRead) {
  STemporalSettings aSettings = settings(true, true, 1e100, sN);
  std::fill(std::begin(aSettings.mWanted), std::end(aSettings.mWanted), false);
  aSettings.mWanted[CTLRX_TF_MAX] = true;
  CTemporalSeries aSeries(aSettings, {0, 1, 2}, {-1, -1, -1});
  // Pixel 1 of three interleaved rows.
  const double aRows[] = {0, 10, 0, 0, 20, 0, 0, 40, 0};
  ASSERT_EQ(aSeries.select(aRows + 1, 3), 3);
  double aValues[CTLRX_TF_VALUE_COUNT];
  int32_t aDates[2];
  aSeries.features(aValues, aDates);
  EXPECT_EQ(aValues[CTLRX_TF_MEDIAN], sN);
  EXPECT_DOUBLE_EQ(aValues[CTLRX_TF_MAX], 10 * std::log10(40 / (70.0 / 3)));
  EXPECT_EQ(aDates[0], CTLRX_TF_NO_DATE);
}

TEST(TemporalSeries, RateLimitIsDecidedExactlyAtItsBoundary) {
  // (4.5 / 3) / 1 == 1.5 is not below 1.5; the next smaller value is.
  EXPECT_EQ(pixel({3, 4.5}, {0, 1}, false, false, 1.5).mKept, 1);
  EXPECT_EQ(pixel({3, std::nextafter(4.5, 0.0)}, {0, 1}, false, false, 1.5).mKept, 2);
  // Over 7 days the limit is 7 x 1.5 times the last value.
  EXPECT_EQ(pixel({0.1, 1.05}, {0, 7}, false, false, 1.5).mKept, (1.05 / 0.1) / 7 < 1.5 ? 2 : 1);
  EXPECT_EQ(pixel({0.1, std::nextafter(1.05, 2.0)}, {0, 7}, false, false, 1.5).mKept,
            (std::nextafter(1.05, 2.0) / 0.1) / 7 < 1.5 ? 2 : 1);
  // Infinite threshold, infinite and subnormal values.
  const double aInf = std::numeric_limits<double>::infinity();
  EXPECT_EQ(pixel({3, 1e300, 5}, {0, 1, 2}, false, false, aInf).mKept, 3);
  EXPECT_EQ(pixel({3, aInf}, {0, 1}, false, false, aInf).mKept, 1);
  EXPECT_EQ(pixel({1e-310, 1e-310}, {0, 1}, false, false, 1.5).mKept, 2);
  EXPECT_EQ(pixel({1e-310, 2e-310}, {0, 1}, false, false, 1.5).mKept, 1);
}

TEST(TemporalSeries, MedianOfEveryLengthMatchesSorting) {
  std::mt19937 aRandom(3);
  std::uniform_int_distribution<int> aDraw(1, 9); // repeats on purpose
  for (int n = 1; n <= 40; ++n)
    for (int aTrial = 0; aTrial < 20; ++aTrial) {
      std::vector<double> aValues;
      std::vector<long> aDays;
      for (int i = 0; i < n; ++i) {
        aValues.push_back(aDraw(aRandom) * 1.5);
        aDays.push_back(i);
      }
      std::vector<double> aSorted = aValues;
      std::sort(aSorted.begin(), aSorted.end());
      const double aExpected = n == 2 ? (aSorted[0] + aSorted[1]) / 2 : aSorted[(n - 1) / 2];
      EXPECT_EQ(pixel(aValues, aDays)[CTLRX_TF_MEDIAN], aExpected) << n;
    }
}

// Whole lines against pixel by pixel, bit for bit: lines mixing pixels the
// blocks take with every kind they leave to the pixel path (no data, NaN, the
// output null value, same days, rate-limit rejections, sums beyond rescaling,
// infinities, values out of the float range); unrequested outputs untouched.
TEST(TemporalSeries, BlocksOfPixelsGiveThePixelByPixelResultsBitForBit) {
  std::mt19937 aRandom(99);
  std::uniform_int_distribution<int> aKind(0, 99);
  std::exponential_distribution<double> aSpeckle(0.2);
  const int P = 700;
  const float aInf = std::numeric_limits<float>::infinity();
  const struct {
    std::vector<long> mDays;
    bool mNormalize, mDb;
    double mRatioTime, mNull;
    bool mPartial; // no median nor first date, and a NaN null for input 1
  } aCases[] = {{{0, 12, 24, 36, 48, 60, 72, 84}, false, false, 1e100, -1, false},
                {{0, 12, 24, 36, 48, 60, 72, 84}, true, true, 1e100, 5, false},
                {{0, 5, 5, 9, 30}, true, false, 0.3, 0, true},
                {{0, 5, 5, 9}, true, false, 1e100, -1, true},
                {{3, 4}, false, true, 2.0, sNaN, false},
                {{0, 7, 14, 21, 28, 35, 42, 49, 56, 63, 70, 77, 84, 91, 98, 105, 112, 119, 126, 133}, false, false,
                 1e100, -1, false}};
  for (const auto &aCase : aCases) {
    const size_t n = aCase.mDays.size();
    const STemporalSettings aSettings = settings(aCase.mNormalize, aCase.mDb, aCase.mRatioTime, aCase.mNull);
    std::vector<double> aNulls(n, -1.0);
    aNulls[n - 1] = 0.0;
    aNulls[0] = aCase.mPartial ? sNaN : -1.0;
    std::vector<double> aRows(n * P);
    const double aKinds[] = {0.0, sNaN, 5.0, 3e7, std::numeric_limits<double>::infinity(), 0.0, 4e39, 1e-45};
    for (size_t i = 0; i < n; ++i)
      for (int x = 0; x < P; ++x) {
        const int k = aKind(aRandom);
        const double v = aSpeckle(aRandom);
        aRows[i * P + x] = k == 0 ? aNulls[i] : k == 5 ? -v : k < 8 ? aKinds[k] : k < 30 && x < 100 ? 0.0 : v;
      }
    CTemporalSeries aSeries(aSettings, aCase.mDays, aNulls);
    std::vector<float> aValues(12 * P, 123.0f);
    std::vector<int32_t> aDates(2 * P, 123);
    STemporalLines aLines;
    for (int f = 0; f < 12; ++f)
      aLines.mValue[f] = aCase.mPartial && f == CTLRX_TF_MEDIAN ? nullptr : &aValues[f * P];
    aLines.mDate[0] = aCase.mPartial ? nullptr : &aDates[0];
    aLines.mDate[1] = &aDates[P];
    aSeries.line(aRows.data(), P, aLines);
    for (int x = 0; x < P; ++x) {
      double aPixel[CTLRX_TF_VALUE_COUNT];
      int32_t aPixelDates[2];
      aSeries.select(aRows.data() + x, P);
      aSeries.features(aPixel, aPixelDates);
      for (int f = 0; f < 12; ++f) {
        const double aExpected = aLines.mValue[f] == nullptr ? 123.0f
                                 : aPixel[f] > 3.4028234663852886e+38  ? aInf
                                 : aPixel[f] < -3.4028234663852886e+38 ? -aInf
                                                                       : static_cast<float>(aPixel[f]);
        const float aGot = aValues[f * P + x];
        EXPECT_TRUE((std::isnan(aExpected) && std::isnan(aGot)) || aGot == aExpected)
            << "inputs " << n << " feature " << f << " pixel " << x << ": " << aGot << " vs " << aExpected;
      }
      EXPECT_EQ(aDates[x], aCase.mPartial ? 123 : aPixelDates[0]) << n << " " << x;
      EXPECT_EQ(aDates[P + x], aPixelDates[1]) << n << " " << x;
    }
  }
}
