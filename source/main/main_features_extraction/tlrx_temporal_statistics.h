// Per-pixel statistics of a dated series: the sample selection, the running
// mean and standard deviation, and the fourteen temporal features with their
// modifiers. Works on plain buffers, one pixel at a time, without allocating.
//
// Selection, over the inputs in temporal order: a value that is no data for
// its input (or not a number) is skipped; the others enter as absolute
// values. The first one is kept; a later one only when
// (v / v_last) / (t - t_last) < ratio-time threshold, v_last and t_last being
// those of the last kept sample. The arithmetic decides the degenerate cases:
// a same-day sample (division by 0 days) and any sample after a kept 0 are
// never kept.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

// The features, in the order of their outputs.
enum ETemporalFeature {
  CTLRX_TF_MEAN,
  CTLRX_TF_STD,
  CTLRX_TF_MEDIAN,
  CTLRX_TF_GRADIENT,
  CTLRX_TF_MAX,
  CTLRX_TF_MIN,
  CTLRX_TF_SPAN_DIFFERENCE,
  CTLRX_TF_MAX_INCREMENT,
  CTLRX_TF_MAX_DECREMENT,
  CTLRX_TF_SPAN_RATIO,
  CTLRX_TF_MAX_RATIO,
  CTLRX_TF_MIN_RATIO,
  CTLRX_TF_DATE_MAX,
  CTLRX_TF_DATE_MIN_BEFORE_MAX,
  CTLRX_TF_COUNT
};
constexpr int CTLRX_TF_VALUE_COUNT = CTLRX_TF_DATE_MAX; // value features come first
constexpr int32_t CTLRX_TF_NO_DATE = -9999;

// Running mean and standard deviation. The partial sums are kept below about
// 1e14 by moving a power of ten into their scale factors, which limits the
// loss of precision on long series of large values. Values equal to the null
// value (both not a number, or within 1.1754943508222875e-38) are ignored.
class CTemporalAccumulator {
public:
  void reset(double theNull);
  void add(double theValue);
  int32_t count() const { return mCount; }
  // The null value when nothing was added.
  double mean() const;
  // Population standard deviation; 0 when rounding makes the variance
  // negative; the null value when nothing was added.
  double std() const;

private:
  double mSum = 0.0, mSumScale = 1.0;
  double mSquares = 0.0, mSquaresScale = 1.0;
  double mNull = 0.0;
  int32_t mCount = 0;
};

struct STemporalSettings {
  double mRatioTimeThreshold = 1e100; // MaxRatioTimeThr
  bool mNormalize = false;           // divide by the temporal mean
  bool mDecibels = false;            // 10 log10
  bool mWanted[CTLRX_TF_COUNT] = {}; // features to compute
  double mNull = 0.0;                // output null value N
};

// One pixel's series: selection, then features. Buffers are sized once for
// the number of inputs.
class CTemporalSeries {
public:
  // theDays: day number of every input, in temporal order (the first is
  // the reference); theNulls: every input's null value.
  CTemporalSeries(const STemporalSettings &theSettings, const std::vector<long> &theDays,
                  const std::vector<double> &theNulls);

  // Selects the samples of one pixel; the value of input i is
  // theValues[i * theStride]. Returns the number kept.
  int32_t select(const double *theValues, size_t theStride);
  int32_t kept() const { return mKept; }
  double keptValue(int32_t theIndex) const { return mValue[theIndex]; }
  int32_t keptDay(int32_t theIndex) const { return mDay[theIndex]; }

  // Features of the selected samples: theValues[f] for the value features
  // (the null value where undefined), theDates[0] and theDates[1] for the
  // two dates (CTLRX_TF_NO_DATE where undefined). Only wanted features are
  // computed; the others hold the null value or CTLRX_TF_NO_DATE.
  void features(double theValues[CTLRX_TF_VALUE_COUNT], int32_t theDates[2]);

private:
  void computeDates(int32_t theDates[2]) const;
  double median();

  STemporalSettings mSettings;
  std::vector<long> mDays;
  std::vector<double> mNulls;
  std::vector<double> mValue;   // kept values
  std::vector<int32_t> mDay;    // their days from the reference
  std::vector<double> mScratch; // median selection
  int32_t mKept = 0;
  CTemporalAccumulator mAccumulator;
};
