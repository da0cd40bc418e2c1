// Shift of one window pair and the least-squares fit with data snooping, on
// windows made in the test: band-limited speckle (osr 1.2) of known
// coherence, the slave moved by a Fourier phase ramp (exact for such data).
#include "tlrx_cross_corr.h"
#include "tlrx_interf_utility.h"

#include <gtest/gtest.h>

#include <cmath>
#include <random>

namespace {

constexpr int CTLRX_SIDE = 64;   // window
constexpr int CTLRX_SCENE = 96;  // periodic scene the windows are cut from
constexpr double CTLRX_OSR = 1.2;

struct SPair {
  std::vector<TLRXComplex> mMaster;
  std::vector<TLRXComplex> mSlave;
};

// Master a, slave g a + sqrt(1 - g^2) n moved by (dx, dy): slave(x) =
// scene(x - d); the windows are the centres of the scenes.
SPair makePair(std::mt19937 &theRandom, double theCoherence, double theDx, double theDy) {
  const int n = CTLRX_SCENE;
  std::normal_distribution<float> aNormal;
  CFftBuffer aA(size_t(n * n)), aB(size_t(n * n));
  for (size_t i = 0; i < aA.size(); ++i) {
    aA[i] = TLRXComplex(aNormal(theRandom), aNormal(theRandom));
    aB[i] = TLRXComplex(aNormal(theRandom), aNormal(theRandom));
  }
  const CFftPlan2D &aForward = fdfFftPlan(n, n, ETLRXFftDirection::FORWARD);
  const CFftPlan2D &aInverse = fdfFftPlan(n, n, ETLRXFftDirection::INVERSE);
  aForward.execute(aA.data());
  aForward.execute(aB.data());
  const float aRest = float(std::sqrt(1 - theCoherence * theCoherence));
  for (int r = 0; r < n; ++r)
    for (int c = 0; c < n; ++c) {
      const double aFr = (2 * r <= n ? r : r - n) / double(n), aFc = (2 * c <= n ? c : c - n) / double(n);
      const size_t i = size_t(r * n + c);
      const bool aIn = std::fabs(aFr) <= 0.5 / CTLRX_OSR && std::fabs(aFc) <= 0.5 / CTLRX_OSR;
      aA[i] = aIn ? aA[i] : TLRXComplex(0, 0);
      aB[i] = aIn ? (float(theCoherence) * aA[i] + aRest * aB[i]) *
                        TLRXComplex(std::polar(1.0, -2 * M_PI * (aFc * theDx + aFr * theDy)))
                  : TLRXComplex(0, 0);
    }
  aInverse.execute(aA.data());
  aInverse.execute(aB.data());
  SPair aPair;
  const int aOffset = (n - CTLRX_SIDE) / 2;
  for (int r = 0; r < CTLRX_SIDE; ++r)
    for (int c = 0; c < CTLRX_SIDE; ++c) {
      aPair.mMaster.push_back(aA[size_t((r + aOffset) * n + c + aOffset)]);
      aPair.mSlave.push_back(aB[size_t((r + aOffset) * n + c + aOffset)]);
    }
  return aPair;
}

} // namespace

TEST(CrossCorrelation, IdenticalWindowsCorrelateToOneAtZeroShift) {
  std::mt19937 aRandom(3);
  const SPair aPair = makePair(aRandom, 1.0, 0.0, 0.0);
  for (const bool aCoherent : {false, true}) {
    CCrossCorrelator aCorrelator(CTLRX_SIDE, CTLRX_SIDE, 16, aCoherent);
    ASSERT_TRUE(aCorrelator.isValid());
    const STLRXWindowShift aShift = aCorrelator.estimate(aPair.mMaster.data(), aPair.mMaster.data());
    ASSERT_TRUE(aShift.valid());
    EXPECT_NEAR(aShift.mCorrelation, 1.0, 1e-5) << aCoherent;
    EXPECT_EQ(aShift.mRangeShift, 0.0);
    EXPECT_EQ(aShift.mAzimuthShift, 0.0);
    EXPECT_GT(aShift.mSnr, 100.0);
  }
}

// Sub-pixel and multi-pixel shifts, both modes, within half a step 1/16.
TEST(CrossCorrelation, KnownShiftsAreFoundWithinHalfAStep) {
  std::mt19937 aRandom(5);
  const struct {
    double mDx, mDy;
  } aCases[] = {{0.3, -0.45}, {1.25, 2.5}, {-3.8, 0.06}, {7.0, -5.5}};
  for (const auto &aCase : aCases)
    for (const bool aCoherent : {false, true}) {
      const SPair aPair = makePair(aRandom, 1.0, aCase.mDx, aCase.mDy);
      CCrossCorrelator aCorrelator(CTLRX_SIDE, CTLRX_SIDE, 16, aCoherent);
      const STLRXWindowShift aShift = aCorrelator.estimate(aPair.mMaster.data(), aPair.mSlave.data());
      ASSERT_TRUE(aShift.valid());
      EXPECT_NEAR(aShift.mRangeShift, aCase.mDx, 1.0 / 32 + 0.01) << aCase.mDx << " " << aCoherent;
      EXPECT_NEAR(aShift.mAzimuthShift, aCase.mDy, 1.0 / 32 + 0.01) << aCase.mDy << " " << aCoherent;
    }
}

// Integer-lag peak: ties go to the first in row-major order; lags are
// unwrapped and the shift is minus the lag.
TEST(CrossCorrelation, TiesGoToTheFirstPeakInRowMajorOrderAndZeroEnergyFails) {
  std::vector<TLRXComplex> aMaster(16 * 16), aSlave(16 * 16), aFlat(16 * 16, TLRXComplex(2, 1));
  aMaster[0 * 16 + 13] = aMaster[2 * 16 + 1] = TLRXComplex(1, 0);
  aSlave[0] = TLRXComplex(1, 0);
  CCrossCorrelator aCorrelator(16, 16, 4, true);
  const STLRXWindowShift aShift = aCorrelator.estimate(aMaster.data(), aSlave.data());
  ASSERT_TRUE(aShift.valid());
  EXPECT_NEAR(aShift.mRangeShift, 3.0, 1e-9); // lag (0, 13) -> (0, -3), before (2, 1)
  EXPECT_NEAR(aShift.mAzimuthShift, 0.0, 1e-9);
  EXPECT_EQ(aCorrelator.estimate(aFlat.data(), aSlave.data()).mFailure, ETLRXPairFailure::ZERO_ENERGY);
  EXPECT_EQ(aCorrelator.estimate(aSlave.data(), aFlat.data()).mFailure, ETLRXPairFailure::ZERO_ENERGY);
}

// Spread of single-window shifts at g = 0.8: within twice the amplitude
// correlation bound combined with the quantisation of the 1/16 step, and
// without bias.
TEST(CrossCorrelation, SingleWindowSpreadStaysWithinTheAmplitudeBound) {
  std::mt19937 aRandom(11);
  std::uniform_real_distribution<double> aFraction(-0.5, 0.5);
  const double g = 0.8, aOversampling = 16;
  const double aSamples = CTLRX_SIDE * CTLRX_SIDE / (CTLRX_OSR * CTLRX_OSR);
  const double aBound = std::sqrt(3 / (10 * aSamples)) * std::sqrt(2 + 5 * g * g - 7 * g * g * g * g) / (M_PI * g * g);
  const double aStep = 1 / (aOversampling * std::sqrt(12.0));
  CCrossCorrelator aCorrelator(CTLRX_SIDE, CTLRX_SIDE, int(aOversampling), false);
  double aSum = 0, aSquares = 0;
  const int aTrials = 120;
  for (int t = 0; t < aTrials; ++t) {
    const double aDx = aFraction(aRandom), aDy = aFraction(aRandom);
    const SPair aPair = makePair(aRandom, g, aDx, aDy);
    const STLRXWindowShift aShift = aCorrelator.estimate(aPair.mMaster.data(), aPair.mSlave.data());
    ASSERT_TRUE(aShift.valid());
    for (const double aError : {aShift.mRangeShift - aDx, aShift.mAzimuthShift - aDy}) {
      aSum += aError;
      aSquares += aError * aError;
    }
  }
  const double aMean = aSum / (2 * aTrials), aSpread = std::sqrt(aSquares / (2 * aTrials) - aMean * aMean);
  EXPECT_LT(aSpread, 2 * std::hypot(aBound, aStep)) << "bound " << aBound;
  EXPECT_LT(std::fabs(aMean), 0.01);
}

TEST(ShiftFit, PolynomialTermsAndExactQuadraticsInPixelCoordinates) {
  const std::vector<double> aTruth = {0.3, 4e-4, -2e-4, 1e-7, -2e-7, 3e-8};
  EXPECT_DOUBLE_EQ(fdfCoregPolyValue(aTruth, 10, 20), 0.3 + 4e-3 - 4e-3 + 1e-5 - 4e-5 + 1.2e-5);
  std::vector<double> aX, aY, aR, aA;
  for (int i = 0; i < 7; ++i)
    for (int j = 0; j < 5; ++j) {
      aX.push_back(100 + 300 * i);
      aY.push_back(50 + 450 * j);
      aR.push_back(fdfCoregPolyValue(aTruth, aX.back(), aY.back()));
      aA.push_back(-aR.back());
    }
  for (const int aCoeffs : {1, 3, 6}) {
    STLRXShiftFit aFit;
    ASSERT_TRUE(fdfFitShiftPolynomials(aX, aY, aR, aA, 6, aCoeffs, 2048, 2048, aFit));
    ASSERT_EQ(aFit.mRange.size(), 6u);
    ASSERT_EQ(aFit.mAzimuth.size(), size_t(aCoeffs));
    for (size_t k = 0; k < 6; ++k)
      EXPECT_NEAR(aFit.mRange[k], aTruth[k], 1e-9 * std::pow(2048.0, -double(k > 0) - double(k > 2)));
    EXPECT_EQ(aFit.mOutliers, 0);
  }
  STLRXShiftFit aFit;
  EXPECT_FALSE(fdfFitShiftPolynomials({1, 2}, {1, 2}, {0, 0}, {0, 0}, 3, 1, 100, 100, aFit)); // too few points
  EXPECT_FALSE(fdfFitShiftPolynomials({1, 2, 3}, {5, 5, 5}, {0, 0, 0}, {0, 0, 0}, 3, 3, 100, 100, aFit)); // singular
}

// Data snooping drops gross errors (in either component) while above 3.29,
// and stops before fewer than three times the unknowns remain.
TEST(ShiftFit, DataSnoopingDropsOutliersAndStopsAtThreeTimesTheUnknowns) {
  std::mt19937 aRandom(7);
  std::normal_distribution<double> aNoise(0.0, 0.01);
  std::vector<double> aX, aY, aR, aA;
  for (int i = 0; i < 10; ++i)
    for (int j = 0; j < 10; ++j) {
      aX.push_back(20 + 100 * i);
      aY.push_back(20 + 100 * j);
      aR.push_back(0.5 + 1e-3 * aX.back() + aNoise(aRandom));
      aA.push_back(-0.2 + 5e-4 * aY.back() + aNoise(aRandom));
    }
  aR[17] += 3.0;
  aA[64] -= 1.5;
  STLRXShiftFit aFit;
  ASSERT_TRUE(fdfFitShiftPolynomials(aX, aY, aR, aA, 3, 3, 1000, 1000, aFit));
  EXPECT_EQ(aFit.mUsed[17], 0);
  EXPECT_EQ(aFit.mUsed[64], 0);
  EXPECT_LE(aFit.mOutliers, 4); // a good point beyond 3.29 sigma now and then
  EXPECT_NEAR(aFit.mRange[1], 1e-3, 5e-5);
  EXPECT_NEAR(aFit.mAzimuth[2], 5e-4, 5e-5);
  EXPECT_NEAR(aFit.mRmsRange, 0.01, 0.003);
  // Six unknowns: with 18 points a gross error stays (17 would be fewer than
  // three times the unknowns), with 19 it goes.
  for (const size_t aCount : {18, 19}) {
    std::vector<double> aSx, aSy, aSr, aSa;
    for (size_t k = 0; k < aCount; ++k) {
      const size_t aPick = (k * 37) % 100; // spread over the grid
      aSx.push_back(aX[aPick]);
      aSy.push_back(aY[aPick]);
      aSr.push_back(aR[aPick] - (aPick == 17 ? 3.0 : 0.0));
      aSa.push_back(aA[aPick] + (aPick == 64 ? 1.5 : 0.0));
    }
    aSr[4] += 100.0;
    ASSERT_TRUE(fdfFitShiftPolynomials(aSx, aSy, aSr, aSa, 6, 6, 1000, 1000, aFit));
    EXPECT_EQ(aFit.mUsed[4], aCount == 18 ? 1 : 0) << aCount;
  }
}
