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

// Runs one pixel: theValues in temporal order on theDays, every feature wanted.
SPixel pixel(const std::vector<double> &theValues, const std::vector<long> &theDays,
             std::vector<double> theNulls = {}, bool theNormalize = false, bool theDb = false,
             double theRatioTime = 1e100, double theNull = sN) {
  STemporalSettings aSettings;
  aSettings.mRatioTimeThreshold = theRatioTime;
  aSettings.mNormalize = theNormalize;
  aSettings.mDecibels = theDb;
  aSettings.mNull = theNull;
  for (bool &aWanted : aSettings.mWanted)
    aWanted = true;
  if (theNulls.empty())
    theNulls.assign(theValues.size(), -1.0);
  CTemporalSeries aSeries(aSettings, theDays, theNulls);
  SPixel aPixel;
  aPixel.mKept = aSeries.select(theValues.data(), 1);
  aSeries.features(aPixel.mValues, aPixel.mDates);
  return aPixel;
}

const std::vector<int> sNeedTwo = {CTLRX_TF_STD, CTLRX_TF_GRADIENT, CTLRX_TF_MAX_INCREMENT, CTLRX_TF_MAX_DECREMENT,
                                     CTLRX_TF_MAX_RATIO, CTLRX_TF_MIN_RATIO};

} // namespace

TEST(TemporalAccumulator, MatchesTwoPassStatisticsAndSkipsTheNullValue) {
  std::mt19937 aRandom(7);
  std::uniform_real_distribution<double> aDraw(0.0, 50.0);
  CTemporalAccumulator aAcc;
  aAcc.reset(3.0);
  std::vector<double> aKept;
  for (int i = 0; i < 101; ++i) {
    const double v = i % 10 == 0 ? 3.0 : aDraw(aRandom);
    aAcc.add(v);
    if (i % 10 != 0)
      aKept.push_back(v);
  }
  long double aSum = 0, aSquares = 0;
  for (double v : aKept)
    aSum += v;
  const long double aMean = aSum / aKept.size();
  for (double v : aKept)
    aSquares += (v - aMean) * (v - aMean);
  EXPECT_EQ(aAcc.count(), static_cast<int32_t>(aKept.size()));
  EXPECT_NEAR(aAcc.mean(), static_cast<double>(aMean), 1e-12);
  EXPECT_NEAR(aAcc.std(), std::sqrt(static_cast<double>(aSquares / aKept.size())), 1e-10);
  // Nothing added: both give the null value, NaN included.
  aAcc.reset(-7.0);
  EXPECT_EQ(aAcc.mean(), -7.0);
  EXPECT_EQ(aAcc.std(), -7.0);
  aAcc.reset(sNaN);
  aAcc.add(sNaN);
  EXPECT_EQ(aAcc.count(), 0);
  EXPECT_TRUE(std::isnan(aAcc.mean()));
}

TEST(TemporalAccumulator, RescalingKeepsLongSeriesOfLargeValuesPrecise) {
  // Squares of 3e9 pass 1e14 at once, sums after a few dozen values.
  CTemporalAccumulator aAcc;
  aAcc.reset(0.0);
  long double aSum = 0, aSumSq = 0;
  for (int i = 0; i < 20000; ++i) {
    const double v = 3e9 + 1e6 * std::sin(0.37 * i);
    aAcc.add(v);
    aSum += v;
    aSumSq += static_cast<long double>(v) * v;
  }
  const long double aMean = aSum / 20000;
  EXPECT_NEAR(aAcc.mean() / static_cast<double>(aMean), 1.0, 1e-12);
  long double aSquares = 0;
  for (int i = 0; i < 20000; ++i) {
    const double v = 3e9 + 1e6 * std::sin(0.37 * i);
    aSquares += (v - aMean) * (v - aMean);
  }
  // The one-pass variance cancels 1e19 against 1e19: check to the digits left.
  EXPECT_NEAR(aAcc.std(), std::sqrt(static_cast<double>(aSquares / 20000)), 2e4);
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

TEST(TemporalSeries, SeriesOfTheExampleGivesTheListedValues) {
  const SPixel p = pixel({10, 20, 15, 30}, {100, 112, 124, 136});
  EXPECT_EQ(p.mKept, 4);
  EXPECT_DOUBLE_EQ(p[CTLRX_TF_MEAN], 18.75);
  EXPECT_DOUBLE_EQ(p[CTLRX_TF_STD], std::sqrt(54.6875));
  EXPECT_EQ(p[CTLRX_TF_MEDIAN], 15);
  EXPECT_EQ(p[CTLRX_TF_MAX_INCREMENT], 15);
  EXPECT_EQ(p[CTLRX_TF_MAX_DECREMENT], -5);
  EXPECT_EQ(p[CTLRX_TF_GRADIENT], 15);
  EXPECT_EQ(p[CTLRX_TF_MAX_RATIO], 2);
  EXPECT_EQ(p[CTLRX_TF_MIN_RATIO], 0.75);
  EXPECT_EQ(p[CTLRX_TF_MAX], 30);
  EXPECT_EQ(p[CTLRX_TF_MIN], 10);
  EXPECT_EQ(p[CTLRX_TF_SPAN_DIFFERENCE], 20);
  EXPECT_EQ(p[CTLRX_TF_SPAN_RATIO], 3);
  EXPECT_EQ(p.mDates[0], 36);
  EXPECT_EQ(p.mDates[1], 0);
}

TEST(TemporalSeries, PixelWithoutDataOrWithOneSample) {
  const SPixel aNone = pixel({-1, -1, sNaN}, {0, 5, 9});
  EXPECT_EQ(aNone.mKept, 0);
  for (double v : aNone.mValues)
    EXPECT_EQ(v, sN);
  EXPECT_EQ(aNone.mDates[0], CTLRX_TF_NO_DATE);
  EXPECT_EQ(aNone.mDates[1], CTLRX_TF_NO_DATE);

  const SPixel aOne = pixel({-1, 4.5, -1}, {0, 5, 9});
  EXPECT_EQ(aOne.mKept, 1);
  for (int f : {CTLRX_TF_MEAN, CTLRX_TF_MEDIAN, CTLRX_TF_MAX, CTLRX_TF_MIN})
    EXPECT_EQ(aOne[f], 4.5) << f;
  EXPECT_EQ(aOne[CTLRX_TF_SPAN_DIFFERENCE], 0);
  EXPECT_EQ(aOne[CTLRX_TF_SPAN_RATIO], 1);
  for (int f : sNeedTwo)
    EXPECT_EQ(aOne[f], sN) << f;
  EXPECT_EQ(aOne.mDates[0], 5);
  EXPECT_EQ(aOne.mDates[1], CTLRX_TF_NO_DATE);
}

TEST(TemporalSeries, SameDayZeroAndThresholdRejections) {
  // Same day: the later acquisition is never kept, whatever its value.
  for (double aSecond : {0.0, 1.0, 5.0, 1e9})
    EXPECT_EQ(pixel({5, aSecond, 6}, {0, 0, 12}).mKept, 2) << aSecond;
  const SPixel aSameDay = pixel({5, 1, 6}, {0, 0, 12});
  EXPECT_EQ(aSameDay[CTLRX_TF_MIN], 5);
  // After a kept 0 every later sample is rejected (ratio infinite or 0/0).
  const SPixel aZero = pixel({3, 0, 4, 0}, {0, 10, 20, 30});
  EXPECT_EQ(aZero.mKept, 2);
  EXPECT_EQ(aZero[CTLRX_TF_MIN], 0);
  EXPECT_TRUE(std::isinf(aZero[CTLRX_TF_SPAN_RATIO]));
  // Threshold 0.5 per day: 10 -> 40 over 4 days is a ratio of 1/day
  // (rejected); 10 -> 15 over 10 days is 0.15/day (kept, from the last kept).
  const SPixel aJump = pixel({10, 40, 15}, {0, 4, 10}, {}, false, false, 0.5);
  EXPECT_EQ(aJump.mKept, 2);
  EXPECT_EQ(aJump[CTLRX_TF_MAX], 15);
  EXPECT_EQ(aJump.mDates[0], 10);
  EXPECT_EQ(fdfMaxRatioThreshold(10), 10);
  EXPECT_DOUBLE_EQ(fdfMaxRatioTimeThreshold(20, 4), 25);
}

TEST(TemporalSeries, NegativeValuesEnterAsMagnitudesAndNaNAsNoData) {
  const SPixel p = pixel({-4, 2, sNaN, -8}, {0, 1, 2, 3});
  EXPECT_EQ(p.mKept, 3);
  EXPECT_EQ(p[CTLRX_TF_MIN], 2);
  EXPECT_EQ(p[CTLRX_TF_MAX], 8);
  EXPECT_EQ(p[CTLRX_TF_MAX_DECREMENT], -2);
  EXPECT_EQ(p[CTLRX_TF_MEDIAN], 4);
  EXPECT_EQ(p.mDates[0], 3);
  EXPECT_EQ(p.mDates[1], 1);
}

TEST(TemporalSeries, NormalisationSparesMeanAndMedianDecibelsSpareTheMean) {
  const SPixel p = pixel({10, 20, 15, 30}, {0, 12, 24, 36}, {}, true, true);
  const double M = 18.75;
  EXPECT_DOUBLE_EQ(p[CTLRX_TF_MEAN], M);
  EXPECT_DOUBLE_EQ(p[CTLRX_TF_MEDIAN], 10 * std::log10(15.0));
  EXPECT_DOUBLE_EQ(p[CTLRX_TF_MAX], 10 * std::log10(30 / M));
  EXPECT_DOUBLE_EQ(p[CTLRX_TF_MIN_RATIO], 10 * std::log10(0.75 / M));
  EXPECT_DOUBLE_EQ(p[CTLRX_TF_STD], 10 * std::log10(std::sqrt(54.6875) / M));
  // The arithmetic decides decibels of negative values: not a number.
  EXPECT_TRUE(std::isnan(p[CTLRX_TF_MAX_DECREMENT]));
  const SPixel q = pixel({10, 20, 15, 30}, {0, 12, 24, 36}, {}, true, false);
  EXPECT_DOUBLE_EQ(q[CTLRX_TF_MEDIAN], 15);
  EXPECT_DOUBLE_EQ(q[CTLRX_TF_MAX_DECREMENT], -5 / M);
  // Dates are not modified.
  EXPECT_EQ(p.mDates[0], 36);
}

TEST(TemporalSeries, KeptSampleEqualToTheNullValueCountsOutsideMeanAndDeviation) {
  // Output null value 5; input nulls differ, so a 5 (or -5) is a sample.
  const SPixel p = pixel({2, -5, 8}, {0, 10, 20}, {-1, -1, -1}, false, false, 1e100, 5.0);
  EXPECT_EQ(p.mKept, 3);
  EXPECT_DOUBLE_EQ(p[CTLRX_TF_MEAN], 5.0);
  EXPECT_DOUBLE_EQ(p[CTLRX_TF_STD], 3.0);
  EXPECT_EQ(p[CTLRX_TF_MEDIAN], 5);
  EXPECT_EQ(p[CTLRX_TF_MAX_INCREMENT], 3);
  EXPECT_EQ(p[CTLRX_TF_MAX_DECREMENT], 3);
  // Only samples equal to it: no mean, so no deviation and nothing to
  // normalise by; the other features stand.
  const SPixel q = pixel({5, 5}, {0, 10}, {-1, -1}, true, false, 1e100, 5.0);
  EXPECT_EQ(q.mKept, 2);
  EXPECT_EQ(q[CTLRX_TF_MEAN], 5.0);
  EXPECT_EQ(q[CTLRX_TF_STD], 5.0);
  EXPECT_EQ(q[CTLRX_TF_MAX], 5.0);
  EXPECT_EQ(q[CTLRX_TF_MEDIAN], 5.0);
  const SPixel r = pixel({5, 5}, {0, 10}, {-1, -1}, false, false, 1e100, 5.0);
  EXPECT_EQ(r[CTLRX_TF_MAX], 5.0);
  EXPECT_EQ(r[CTLRX_TF_MAX_RATIO], 1.0);
}

TEST(TemporalSeries, MedianRulesAndTiesOfTheDates) {
  EXPECT_EQ(pixel({3, 9}, {0, 1})[CTLRX_TF_MEDIAN], 6);
  EXPECT_EQ(pixel({7, 3, 9, 1}, {0, 1, 2, 3})[CTLRX_TF_MEDIAN], 3);
  EXPECT_EQ(pixel({7, 3, 9, 1, 5}, {0, 1, 2, 3, 4})[CTLRX_TF_MEDIAN], 5);
  // The first of equal maxima, and the first of equal minima before it.
  const SPixel p = pixel({4, 2, 9, 2, 9}, {0, 3, 6, 9, 12});
  EXPECT_EQ(p.mDates[0], 6);
  EXPECT_EQ(p.mDates[1], 3);
  // Maximum first: no minimum before it.
  EXPECT_EQ(pixel({9, 2}, {0, 3}).mDates[1], CTLRX_TF_NO_DATE);
}

TEST(TemporalSeries, OnlyWantedFeaturesAreComputedAndStridedInputsAreRead) {
  STemporalSettings aSettings;
  aSettings.mNull = sN;
  aSettings.mWanted[CTLRX_TF_MAX] = true;
  aSettings.mNormalize = true;
  aSettings.mDecibels = true;
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
  EXPECT_EQ(pixel({3, 4.5}, {0, 1}, {}, false, false, 1.5).mKept, 1);
  EXPECT_EQ(pixel({3, std::nextafter(4.5, 0.0)}, {0, 1}, {}, false, false, 1.5).mKept, 2);
  // Over 7 days the limit is 7 x 1.5 times the last value.
  EXPECT_EQ(pixel({0.1, 1.05}, {0, 7}, {}, false, false, 1.5).mKept, (1.05 / 0.1) / 7 < 1.5 ? 2 : 1);
  EXPECT_EQ(pixel({0.1, std::nextafter(1.05, 2.0)}, {0, 7}, {}, false, false, 1.5).mKept,
            (std::nextafter(1.05, 2.0) / 0.1) / 7 < 1.5 ? 2 : 1);
  // Infinite threshold, infinite and subnormal values.
  const double aInf = std::numeric_limits<double>::infinity();
  EXPECT_EQ(pixel({3, 1e300, 5}, {0, 1, 2}, {}, false, false, aInf).mKept, 3);
  EXPECT_EQ(pixel({3, aInf}, {0, 1}, {}, false, false, aInf).mKept, 1);
  EXPECT_EQ(pixel({1e-310, 1e-310}, {0, 1}, {}, false, false, 1.5).mKept, 2);
  EXPECT_EQ(pixel({1e-310, 2e-310}, {0, 1}, {}, false, false, 1.5).mKept, 1);
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

TEST(TemporalSeries, WholeLinesMatchPixelByPixel) {
  STemporalSettings aSettings;
  aSettings.mNull = sN;
  aSettings.mNormalize = true;
  for (bool &aWanted : aSettings.mWanted)
    aWanted = true;
  const std::vector<long> aDays = {0, 5, 5, 9};
  const std::vector<double> aNulls = {-1, 0, -1, sNaN};
  CTemporalSeries aSeries(aSettings, aDays, aNulls);
  const int P = 5;
  const double aRows[4 * P] = {1, -1, 3, 4e39, 0,  //
                               2, 0, 0, 1, 7,      //
                               3, 2, 5, 1e-45, 7,  //
                               sNaN, 1, 2, 3, 7};
  std::vector<float> aValues(12 * P);
  std::vector<int32_t> aDates(P), aUnused(P, 123);
  STemporalLines aLines;
  for (int f = 0; f < 12; ++f)
    if (f != CTLRX_TF_MEDIAN)
      aLines.mValue[f] = &aValues[f * P];
  aLines.mDate[1] = aDates.data();
  aSeries.line(aRows, P, aLines);
  for (int x = 0; x < P; ++x) {
    double aPixel[CTLRX_TF_VALUE_COUNT];
    int32_t aPixelDates[2];
    aSeries.select(aRows + x, P);
    aSeries.features(aPixel, aPixelDates);
    for (int f = 0; f < 12; ++f) {
      if (f == CTLRX_TF_MEDIAN)
        continue;
      const double aExpected = aPixel[f] > 3.4028234663852886e+38    ? std::numeric_limits<double>::infinity()
                               : aPixel[f] < -3.4028234663852886e+38 ? -std::numeric_limits<double>::infinity()
                                                                     : static_cast<float>(aPixel[f]);
      if (std::isnan(aExpected))
        EXPECT_TRUE(std::isnan(aValues[f * P + x])) << f << " " << x;
      else
        EXPECT_EQ(aValues[f * P + x], aExpected) << f << " " << x;
    }
    EXPECT_EQ(aDates[x], aPixelDates[1]) << x;
  }
  EXPECT_EQ(aValues[CTLRX_TF_MEAN * P + 3], std::numeric_limits<float>::infinity());
  EXPECT_EQ(aUnused, std::vector<int32_t>(P, 123));
}

TEST(TemporalSeries, BlocksOfPixelsGiveThePixelByPixelResultsBitForBit) {
  // Long lines mixing pixels the blocks take with every kind they leave to
  // the pixel path: no data, NaN, samples equal to the output null value,
  // same-day inputs, rejections near the rate limit, sums beyond the
  // rescaling limit, infinities.
  std::mt19937 aRandom(99);
  std::uniform_int_distribution<int> aKind(0, 99);
  std::exponential_distribution<double> aSpeckle(0.2);
  const int P = 700;
  struct SCase {
    std::vector<long> mDays;
    bool mNormalize, mDb;
    double mRatioTime, mNull;
  } aCases[] = {{{0, 12, 24, 36, 48, 60, 72, 84}, false, false, 1e100, -1},
                {{0, 12, 24, 36, 48, 60, 72, 84}, true, true, 1e100, 5},
                {{0, 5, 5, 9, 30}, true, false, 0.3, 0},
                {{3, 4}, false, true, 2.0, sNaN},
                {{0, 7, 14, 21, 28, 35, 42, 49, 56, 63, 70, 77, 84, 91, 98, 105, 112, 119, 126, 133},
                 false, false, 1e100, -1}};
  for (const SCase &aCase : aCases) {
    const size_t n = aCase.mDays.size();
    STemporalSettings aSettings;
    aSettings.mNull = aCase.mNull;
    aSettings.mNormalize = aCase.mNormalize;
    aSettings.mDecibels = aCase.mDb;
    aSettings.mRatioTimeThreshold = aCase.mRatioTime;
    for (bool &aWanted : aSettings.mWanted)
      aWanted = true;
    std::vector<double> aNulls(n, -1.0);
    aNulls[n - 1] = 0.0;
    std::vector<double> aRows(n * P);
    for (size_t i = 0; i < n; ++i)
      for (int x = 0; x < P; ++x) {
        const int k = aKind(aRandom);
        double v = aSpeckle(aRandom);
        if (k == 0)
          v = aNulls[i];
        else if (k == 1)
          v = sNaN;
        else if (k == 2)
          v = 5.0;
        else if (k == 3)
          v = 3e7;
        else if (k == 4)
          v = std::numeric_limits<double>::infinity();
        else if (k == 5)
          v = -v;
        else if (k < 30 && x < 100)
          v = 0.0;
        aRows[i * P + x] = v;
      }
    CTemporalSeries aSeries(aSettings, aCase.mDays, aNulls);
    std::vector<float> aValues(12 * P);
    std::vector<int32_t> aDates(2 * P);
    STemporalLines aLines;
    for (int f = 0; f < 12; ++f)
      aLines.mValue[f] = &aValues[f * P];
    aLines.mDate[0] = &aDates[0];
    aLines.mDate[1] = &aDates[P];
    aSeries.line(aRows.data(), P, aLines);
    for (int x = 0; x < P; ++x) {
      double aPixel[CTLRX_TF_VALUE_COUNT];
      int32_t aPixelDates[2];
      aSeries.select(aRows.data() + x, P);
      aSeries.features(aPixel, aPixelDates);
      for (int f = 0; f < 12; ++f) {
        const double aExpected = aPixel[f] > 3.4028234663852886e+38    ? std::numeric_limits<double>::infinity()
                                 : aPixel[f] < -3.4028234663852886e+38 ? -std::numeric_limits<double>::infinity()
                                                                       : static_cast<float>(aPixel[f]);
        const float aGot = aValues[f * P + x];
        EXPECT_TRUE((std::isnan(aExpected) && std::isnan(aGot)) || aGot == aExpected)
            << "inputs " << n << " feature " << f << " pixel " << x << ": " << aGot << " vs " << aExpected;
      }
      EXPECT_EQ(aDates[x], aPixelDates[0]) << n << " " << x;
      EXPECT_EQ(aDates[P + x], aPixelDates[1]) << n << " " << x;
    }
  }
}
