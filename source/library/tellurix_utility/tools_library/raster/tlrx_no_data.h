// No-data rule of rasters, the one every reader and kernel applies.
//
// A value v is no data for the null value D (a raster's NullCellValue) when
// v and D are both NaN, or when D is a number and
// D - CTLRX_NULL_TOLERANCE <= v <= D + CTLRX_NULL_TOLERANCE.
// By this rule a NaN value with a numeric null is a value: each command says
// where it calls the rule whether it keeps it (isNull) or drops it as no data
// too (isNullOrNaN). A complex cell is no data when both its parts are.
//
// The tests are comparisons joined by bitwise operators, without branches,
// so the loops over cells that call them vectorise.
#pragma once

#include <cmath>
#include <limits>

// The smallest normal float: the half-width of the no-data interval.
constexpr double CTLRX_NULL_TOLERANCE = 1.1754943508222875e-38;
static_assert(CTLRX_NULL_TOLERANCE == static_cast<double>(std::numeric_limits<float>::min()),
              "the no-data tolerance is the smallest normal float");

// The rule for one null value, its interval computed once.
struct SNoData {
  double mNull = 0.0;
  double mLow = -CTLRX_NULL_TOLERANCE; // NaN for a NaN null: no comparison holds
  double mHigh = CTLRX_NULL_TOLERANCE;
  bool mNullIsNaN = false;

  SNoData() = default;
  explicit SNoData(double theNull)
      : mNull(theNull), mLow(theNull - CTLRX_NULL_TOLERANCE), mHigh(theNull + CTLRX_NULL_TOLERANCE),
        mNullIsNaN(std::isnan(theNull)) {}

  // The rule itself: a NaN value is no data only for a NaN null.
  bool isNull(double theValue) const {
    return (mNullIsNaN & (theValue != theValue)) | ((theValue >= mLow) & (theValue <= mHigh));
  }
  // The rule, and a NaN value is no data whatever the null.
  bool isNullOrNaN(double theValue) const {
    return (theValue != theValue) | ((theValue >= mLow) & (theValue <= mHigh));
  }
  // Complex cells: no data when both parts are.
  bool isNullPair(double theRe, double theIm) const { return isNull(theRe) & isNull(theIm); }
};
