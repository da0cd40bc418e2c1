// Per-pixel statistics of a dated series: the sample selection, the running
// mean and standard deviation, and the fourteen temporal features with their
// modifiers. Works on plain buffers, one pixel at a time, without allocating.
//
// Selection, over the inputs in temporal order: a value that is no data for
// its input by the raster rule (tlrx_no_data.h), or not a number whatever the
// null value, is skipped; the others enter as absolute values. The first one is kept; a later one only when
// (v / v_last) / (t - t_last) < ratio-time threshold, v_last and t_last being
// those of the last kept sample. The arithmetic decides the degenerate cases:
// a same-day sample (division by 0 days) and any sample after a kept 0 are
// never kept.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "tlrx_no_data.h"

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
// loss of precision on long series of large values. Values that are no data
// for the null value by the raster rule are ignored.
class CTemporalAccumulator {
public:
  void reset(double theNull);
  // Adds theCount values no larger than theLargest (>= 0), as add() one by
  // one would; when the sums cannot pass the rescaling limit, without its
  // tests.
  void addAll(const double *theValues, int32_t theCount, double theLargest);
  // Inline: called for every kept sample of every pixel.
  void add(double theValue) {
    if (isNull(theValue))
      return;
    scaledAdd(mSum, mSumScale, theValue);
    scaledAdd(mSquares, mSquaresScale, theValue * theValue);
    ++mCount;
  }
  int32_t count() const { return mCount; }
  // The null value when nothing was added.
  double mean() const;
  // Population standard deviation; 0 when rounding makes the variance
  // negative; the null value when nothing was added.
  double std() const;

private:
  bool isNull(double theValue) const { return mNoData.isNull(theValue); }
  // A scale of 1 divides exactly, so the usual case skips the division.
  static void scaledAdd(double &theSum, double &theScale, double theValue) {
    if (theSum > 1e14) {
      theScale *= 10.0;
      theSum = 0.1 * theSum + theValue / theScale;
    } else {
      theSum += theScale == 1.0 ? theValue : theValue / theScale;
    }
  }

  double mSum = 0.0, mSumScale = 1.0;
  double mSquares = 0.0, mSquaresScale = 1.0;
  SNoData mNoData;
  int32_t mCount = 0;
};

struct STemporalSettings {
  double mRatioTimeThreshold = 1e100; // MaxRatioTimeThr
  bool mNormalize = false;           // divide by the temporal mean
  bool mDecibels = false;            // 10 log10
  bool mWanted[CTLRX_TF_COUNT] = {}; // features to compute
  double mNull = 0.0;                // output null value N
};

// Where a line of features goes: one float line per value feature and one
// integer line per date, nullptr for the features not written.
struct STemporalLines {
  float *mValue[CTLRX_TF_VALUE_COUNT] = {};
  int32_t *mDate[2] = {};
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
  // two dates (CTLRX_TF_NO_DATE where undefined). The median, the standard
  // deviation and the dates are computed only when wanted, the modifiers
  // applied only to wanted features; other entries are not to be used.
  void features(double theValues[CTLRX_TF_VALUE_COUNT], int32_t theDates[2]);

  // Both steps for every pixel of a line, the value of input i at pixel x
  // being theRows[i * thePixels + x]; values stored as floats (beyond the
  // float range: infinite), dates as integers.
  void line(const double *theRows, int32_t thePixels, const STemporalLines &theLines);

private:
  // Runs of pixels are computed together, as loops over the pixels that
  // the compiler vectorises, for the pixels that surely keep every sample,
  // none equal to the output null value, with sums that cannot reach the
  // rescaling limit (nearly all of them): the same operations in the same
  // order as select() and features(), so the results are identical. The
  // others ("in doubt") go through select() and features().
  struct SBlock {
    std::vector<double> mValues;   // value j of block pixel m at j * size + m
    std::vector<double> mSorted;   // the same, through the sorting network
    std::vector<double> mState;    // running quantities, one row each
    std::vector<double> mFeatures; // feature f of block pixel m at f * size + m
    std::vector<int32_t> mDates;   // date d of block pixel m at d * size + m
    std::vector<double> mDoubt;    // non-zero: block pixel m goes one by one
    std::vector<int32_t> mNetwork; // compare-exchanges for all inputs: low, high, ...
    int32_t mCount = 0;
  };

  void computeDates(int32_t theDates[2]) const;
  double median();
  // Block steps (tlrx_temporal_block.cpp): the pixels' values and whether
  // each is in doubt; the features of the block; the rows of SBlock::mState.
  void gatherBlock(const double *theRows, size_t theStride);
  void computeBlock();
  static int32_t blockStateRows();

  // What the selection needs of every input, in temporal order.
  struct SInputTerms {
    SNoData mNoData;
    double mDay;                // day number
    int32_t mFromReference;     // days from the first input
  };

  STemporalSettings mSettings;
  std::vector<SInputTerms> mInputs;
  std::vector<double> mValue;   // kept values
  std::vector<double> mRatio;   // mValue[j] / mValue[j - 1], from j = 1
  std::vector<int32_t> mDay;    // their days from the reference
  std::vector<double> mScratch; // median selection
  std::vector<int> mModified;   // wanted features the modifiers change
  int32_t mKept = 0;
  double mLargest = 0.0; // of the kept values
  CTemporalAccumulator mAccumulator;
  SBlock mBlock;
};
