// One line of ratios against the direct formula, and the histogram classes.
#include "ratio_images.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>

TEST(RatioLine, NullRulesLinearAndDecibels) {
  const double aA[] = {4, 0, 5, 3, 8, 2};
  const int32_t aValidA[] = {1, 1, 1, 0, 1, 1};
  const double aB[] = {2, 2, 0, 1, -4, 1e-39};
  const int32_t aValidB[] = {1, 1, 1, 1, 1, 1};
  float aOut[6];
  long long aHistogram[12] = {};
  fdfRatioLine(aA, aValidA, aB, aValidB, 6, false, -9999.0f, aOut, aHistogram);
  const float aLinear[] = {2, 0, -9999, -9999, -9999, -9999};
  for (int i = 0; i < 6; ++i)
    EXPECT_EQ(aOut[i], aLinear[i]) << i;
  fdfRatioLine(aA, aValidA, aB, aValidB, 6, true, -9999.0f, aOut, aHistogram);
  EXPECT_NEAR(aOut[0], 3.0103, 1e-4);
  EXPECT_TRUE(std::isinf(aOut[1]) && aOut[1] < 0); // log10(0)
  EXPECT_EQ(aOut[2], -9999.0f);
}

TEST(RatioLine, HistogramClassesAreStrictAndNaNIsOther) {
  // Values exactly at a limit (those a float holds exactly) belong to the next class.
  const double aValues[] = {-10.5, -10, -1, -0.09, 0.05, 0.125, 1, 10, 100, 1000, 10000, 100000, 1000000, 2e6};
  const int aExpected[] = {0, 1, 2, 3, 3, 4, 5, 6, 7, 8, 9, 10, 11, 11};
  for (size_t i = 0; i < sizeof aValues / sizeof aValues[0]; ++i) {
    const double aOne = 1.0;
    const int32_t aValid = 1;
    float aOut;
    long long aHistogram[12] = {};
    fdfRatioLine(&aValues[i], &aValid, &aOne, &aValid, 1, false, -9999.0f, &aOut, aHistogram);
    EXPECT_EQ(aHistogram[aExpected[i]], 1) << aValues[i];
  }
  const double aNaN = std::numeric_limits<double>::quiet_NaN(), aOne = 1.0;
  const int32_t aValid = 1;
  float aOut;
  long long aHistogram[12] = {};
  fdfRatioLine(&aNaN, &aValid, &aOne, &aValid, 1, false, aNaN, &aOut, aHistogram);
  EXPECT_EQ(aHistogram[11], 1);
}
