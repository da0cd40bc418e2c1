// Resampling kernels: names, fallback order, and the polynomials each one
// reproduces exactly.
#include "tlrx_resampling_kernels.h"

#include <gtest/gtest.h>

#include <cmath>

namespace {

// Sum of w_k p(first + k) for the taps at thePosition.
template <typename F>
double apply(const SKernelTaps &theTaps, F thePolynomial) {
  double aSum = 0;
  for (int32_t k = 0; k < theTaps.mCount; ++k)
    aSum += theTaps.mWeight[k] * thePolynomial(theTaps.mFirst + k);
  return aSum;
}

const double sPositions[] = {-3.0, -0.75, 0.0, 0.1, 0.5, 0.999, 2.25, 7.6, 123.5};

} // namespace

TEST(ResamplingKernels, NamesAreExactAndUnknownOnesMeanNearestNeighbour) {
  const char *const aNames[] = {"nearest_neighbour", "bilinear_interpolation", "3th_order_cc", "4th_order_cc",
                                "sinc_interpolation", "mean", "weight"};
  for (const char *aName : aNames) {
    bool aKnown = false;
    EXPECT_STREQ(fdfKernelName(fdfKernelFromName(aName, aKnown)), aName);
    EXPECT_TRUE(aKnown);
  }
  for (const char *aName : {"Bilinear_interpolation", "bilinear", "", "3rd_order_cc", "mean "}) {
    bool aKnown = true;
    EXPECT_EQ(fdfKernelFromName(aName, aKnown), ETLRXKernel::NEAREST) << aName;
    EXPECT_FALSE(aKnown) << aName;
  }
}

TEST(ResamplingKernels, FallbackOrderStepsDownToNearestNeighbour) {
  EXPECT_EQ(fdfKernelFallback(ETLRXKernel::SINC), ETLRXKernel::CUBIC4);
  EXPECT_EQ(fdfKernelFallback(ETLRXKernel::CUBIC4), ETLRXKernel::CUBIC3);
  EXPECT_EQ(fdfKernelFallback(ETLRXKernel::CUBIC3), ETLRXKernel::BILINEAR);
  EXPECT_EQ(fdfKernelFallback(ETLRXKernel::BILINEAR), ETLRXKernel::NEAREST);
  EXPECT_EQ(fdfKernelFallback(ETLRXKernel::NEAREST), ETLRXKernel::NEAREST);
  EXPECT_TRUE(fdfIsFootprintKernel(ETLRXKernel::MEAN));
  EXPECT_TRUE(fdfIsFootprintKernel(ETLRXKernel::WEIGHT));
  EXPECT_FALSE(fdfIsFootprintKernel(ETLRXKernel::SINC));
}

TEST(ResamplingKernels, InterpolatorsReproduceTheirPolynomialsExactly) {
  struct SCase {
    ETLRXKernel mKernel;
    int mDegree; // highest degree reproduced exactly
    int32_t mTaps, mBefore;
  } aCases[] = {{ETLRXKernel::BILINEAR, 1, 2, 0}, {ETLRXKernel::CUBIC3, 2, 4, 1}, {ETLRXKernel::CUBIC4, 3, 6, 2}};
  for (const SCase &aCase : aCases)
    for (double x : sPositions) {
      SKernelTaps aTaps;
      fdfInterpolationTaps(aCase.mKernel, x, aTaps);
      ASSERT_EQ(aTaps.mCount, aCase.mTaps);
      EXPECT_EQ(aTaps.mFirst, static_cast<int32_t>(std::floor(x)) - aCase.mBefore);
      for (int d = 0; d <= aCase.mDegree; ++d)
        EXPECT_NEAR(apply(aTaps, [d](double j) { return std::pow(j - 2.0, d); }), std::pow(x - 2.0, d),
                    1e-9 * std::max(1.0, std::pow(std::fabs(x - 2.0), d)))
            << fdfKernelName(aCase.mKernel) << " degree " << d << " at " << x;
    }
  // Bilinear is no more than linear: a parabola between samples is not kept.
  SKernelTaps aTaps;
  fdfInterpolationTaps(ETLRXKernel::BILINEAR, 0.5, aTaps);
  EXPECT_NEAR(apply(aTaps, [](double j) { return j * j; }), 0.5, 1e-12);
}

TEST(ResamplingKernels, SincIsExactOnSamplesAndConstantsAndCloseOnARamp) {
  for (double x : sPositions) {
    SKernelTaps aTaps;
    fdfInterpolationTaps(ETLRXKernel::SINC, x, aTaps);
    ASSERT_EQ(aTaps.mCount, 8);
    EXPECT_NEAR(apply(aTaps, [](double) { return 3.5; }), 3.5, 1e-12);
    EXPECT_NEAR(apply(aTaps, [](double j) { return j; }), x, 0.02);
    if (x == std::floor(x)) {
      EXPECT_NEAR(apply(aTaps, [](double j) { return j * j * j; }), x * x * x, 1e-9);
    }
  }
}

TEST(ResamplingKernels, NearestNeighbourAndFootprints) {
  SKernelTaps aTaps;
  for (double x : {-0.5, -0.25, 0.49, 0.5, 2.7}) {
    fdfInterpolationTaps(ETLRXKernel::NEAREST, x, aTaps);
    EXPECT_EQ(aTaps.mCount, 1);
    EXPECT_EQ(aTaps.mFirst, static_cast<int32_t>(std::floor(x + 0.5))) << x;
  }
  // A footprint aligned on one cell covers it alone.
  ASSERT_TRUE(fdfFootprintTaps(ETLRXKernel::WEIGHT, 3.0, 0.5, aTaps));
  double aTotal = 0;
  for (int32_t k = 0; k < aTaps.mCount; ++k)
    if (aTaps.mWeight[k] > 0) {
      EXPECT_EQ(aTaps.mFirst + k, 3);
      aTotal += aTaps.mWeight[k];
    }
  EXPECT_DOUBLE_EQ(aTotal, 1.0);
  // [2.7, 3.7] overlaps cell 3 by 0.8 and cell 4 by 0.2 (cells are [j-0.5, j+0.5]).
  ASSERT_TRUE(fdfFootprintTaps(ETLRXKernel::WEIGHT, 3.2, 0.5, aTaps));
  ASSERT_EQ(aTaps.mFirst, 3);
  EXPECT_NEAR(aTaps.mWeight[0], 0.8, 1e-12);
  EXPECT_NEAR(aTaps.mWeight[1], 0.2, 1e-12);
  ASSERT_TRUE(fdfFootprintTaps(ETLRXKernel::MEAN, 3.2, 0.5, aTaps));
  EXPECT_EQ(aTaps.mWeight[0], 1.0);
  EXPECT_EQ(aTaps.mWeight[1], 1.0);
  EXPECT_FALSE(fdfFootprintTaps(ETLRXKernel::MEAN, 0.0, 4.5, aTaps));
}
