// One line of ratios against the direct formula, and the histogram classes.
#include "tlrx_ratio_line.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>

// Input 1's null is -7; input 2 holds NaN with a numeric null (not no data).
// Histogram values exactly at a limit (those a float holds exactly) belong to
// the next class; NaN is "other".
TEST(RatioLine, NullRulesLinearDecibelsAndStrictHistogramClasses) {
  const float aNaN = std::numeric_limits<float>::quiet_NaN();
  const float aA[] = {4, 0, 5, -7, 8, 2, 1};
  const float aB[] = {2, 2, 0, 1, -4, 1e-39f, aNaN};
  float aOut[7];
  long long aHistogram[12] = {};
  fdfRatioLine(aA, -7, aB, 3, 7, false, -9999.0f, aOut, aHistogram);
  const float aLinear[] = {2, 0, -9999, -9999, -9999, -9999};
  for (int i = 0; i < 6; ++i)
    EXPECT_EQ(aOut[i], aLinear[i]) << i;
  EXPECT_TRUE(std::isnan(aOut[6]));
  const float aNaNInput[] = {aNaN, 2};
  const float aOnes[] = {1, 1};
  fdfRatioLine(aNaNInput, aNaN, aOnes, aNaN, 2, false, aNaN, aOut, aHistogram);
  EXPECT_TRUE(std::isnan(aOut[0]));
  EXPECT_EQ(aOut[1], 2.0f);
  fdfRatioLine(aA, -7, aB, 3, 7, true, -9999.0f, aOut, aHistogram);
  EXPECT_NEAR(aOut[0], 3.0103, 1e-4);
  EXPECT_TRUE(std::isinf(aOut[1]) && aOut[1] < 0); // log10(0)
  EXPECT_EQ(aOut[2], -9999.0f);
  const double aValues[] = {-10.5, -10, -1, -0.09, 0.05, 0.125, 1, 10, 100, 1000, 10000, 100000, 1000000, 2e6, NAN};
  const int aClass[] = {0, 1, 2, 3, 3, 4, 5, 6, 7, 8, 9, 10, 11, 11, 11};
  for (size_t i = 0; i < sizeof aValues / sizeof aValues[0]; ++i) {
    const float aValue = static_cast<float>(aValues[i]);
    long long aClasses[12] = {};
    fdfRatioLine(&aValue, -9999, aOnes, -9999, 1, false, -9999.0f, aOut, aClasses);
    EXPECT_EQ(aClasses[aClass[i]], 1) << aValues[i];
  }
}
