// No-data rule: one table over the kinds of null value and of value.
#include <gtest/gtest.h>
#include <cmath>
#include "tlrx_no_data.h"

namespace {

constexpr double sNaN = std::numeric_limits<double>::quiet_NaN();
constexpr double sInf = std::numeric_limits<double>::infinity();
constexpr double sFltMin = 1.1754943508222875e-38; // smallest normal float

const struct SRuleCase {
  const char *mWhat;
  double mNull, mValue;
  bool mIsNull, mNullOrNaN; // isNull, isNullOrNaN
} sCases[] = {
    {"numeric null", -9999.0, -9999.0, true, true},
    {"another value", -9999.0, -9998.9999, false, false},
    {"within the tolerance", 0.0, 1e-38, true, true},
    {"on the upper bound", 0.0, sFltMin, true, true},
    {"on the lower bound", 0.0, -sFltMin, true, true},
    {"just beyond the bound", 0.0, std::nextafter(sFltMin, 1.0), false, false},
    {"beyond the tolerance", 0.0, 1.2e-38, false, false},
    {"NaN null, NaN value", sNaN, sNaN, true, true},
    {"NaN null, number", sNaN, 0.0, false, false},
    {"NaN value, numeric null", -9999.0, sNaN, false, true},
    {"NaN value, null 0", 0.0, sNaN, false, true},
    {"infinite value", 0.0, sInf, false, false},
    {"infinite null", sInf, sInf, true, true},
};

} // namespace

TEST(NoDataRule, TableOfNullKinds) {
  for (const SRuleCase &aCase : sCases) {
    SCOPED_TRACE(aCase.mWhat);
    const SNoData aRule(aCase.mNull);
    EXPECT_EQ(aRule.isNull(aCase.mValue), aCase.mIsNull);
    EXPECT_EQ(aRule.isNullOrNaN(aCase.mValue), aCase.mNullOrNaN);
    // A complex cell is no data when both parts are, never by one part.
    EXPECT_EQ(aRule.isNullPair(aCase.mValue, aCase.mValue), aCase.mIsNull);
    EXPECT_FALSE(aRule.isNullPair(aCase.mValue, 12345.0) || aRule.isNullPair(12345.0, aCase.mValue));
  }
}

TEST(NoDataRule, DefaultIsTheNullOfAHeaderWithoutOne) {
  const SNoData aDefault, aZero(0.0);
  EXPECT_EQ(aDefault.mNull, 0.0);
  EXPECT_EQ(aDefault.mLow, aZero.mLow);
  EXPECT_EQ(aDefault.mHigh, aZero.mHigh);
  EXPECT_FALSE(aDefault.mNullIsNaN);
}
