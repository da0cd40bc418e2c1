// Common-band filters and range oversampling: tones and bands against direct
// formulas, and the fringe estimator on simulated pairs (tlrx_simulate slc).
// The decorrelation the filters undo is checked through the interferogram
// step (test_interferogram.cpp).
#include "tlrx_command_test_support.h"
#include "tlrx_common_band.h"
#include "tlrx_slc_test_support.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <limits>
#include <random>

namespace {

const double CTLRX_PI = 3.14159265358979323846;
using TLine = std::vector<TLRXComplex>;

TLRXComplex turn(double theCycles) {
  return TLRXComplex(static_cast<float>(std::cos(2 * CTLRX_PI * theCycles)),
                     static_cast<float>(std::sin(2 * CTLRX_PI * theCycles)));
}

TLine tone(double theFrequency, int theCount, double theStart = 0) {
  TLine aLine(static_cast<size_t>(theCount));
  for (int i = 0; i < theCount; ++i)
    aLine[size_t(i)] = turn(theFrequency * (theStart + i));
  return aLine;
}

class CommonBand : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }
};

} // namespace

TEST(CommonRangeBands, EachImageKeepsTheEndItsPartnerSharesAndNothingIsLeftBeyondTheBandwidth) {
  const struct {
    double mFringe, mBandwidth;
    bool mOk;
    double mMaster[2], mSlave[2];
  } aCases[] = {{0.1, 0.8, true, {-0.3, 0.4}, {-0.4, 0.3}},   {-0.2, 0.8, true, {-0.4, 0.2}, {-0.2, 0.4}},
                {0.0, 1.0, true, {-0.5, 0.5}, {-0.5, 0.5}},   {0.3, 1.0, true, {-0.2, 0.5}, {-0.5, 0.2}},
                {0.79, 0.8, true, {0.39, 0.4}, {-0.4, -0.39}}, {0.8, 0.8, false, {-0.5, 0.5}, {-0.5, 0.5}},
                {-0.9, 0.8, false, {-0.5, 0.5}, {-0.5, 0.5}}, {0.0, 0.0, false, {-0.5, 0.5}, {-0.5, 0.5}},
                {std::nan(""), 0.8, false, {-0.5, 0.5}, {-0.5, 0.5}}};
  for (const auto &aCase : aCases) {
    SCOPED_TRACE(std::to_string(aCase.mFringe) + " " + std::to_string(aCase.mBandwidth));
    SRangeBand aMaster{0.1, 0.2}, aSlave{0.1, 0.2};
    EXPECT_EQ(fdfCommonRangeBands(aCase.mFringe, aCase.mBandwidth, aMaster, aSlave), aCase.mOk);
    EXPECT_NEAR(aMaster.mLow, aCase.mMaster[0], 1e-12);
    EXPECT_NEAR(aMaster.mHigh, aCase.mMaster[1], 1e-12);
    EXPECT_NEAR(aSlave.mLow, aCase.mSlave[0], 1e-12);
    EXPECT_NEAR(aSlave.mHigh, aCase.mSlave[1], 1e-12);
  }
}

TEST(RangeOversampler, KeepsTheSamplesInterpolatesTonesAndCutsOutsideTheBand) {
  std::mt19937 aRandom(3);
  std::normal_distribution<float> aNormal;
  for (const int aPixels : {75, 100})
    for (const int aFactor : {1, 2, 3}) {
      SCOPED_TRACE(std::to_string(aPixels) + " x " + std::to_string(aFactor));
      CRangeOversampler aOversampler(aPixels, aFactor);
      ASSERT_EQ(aOversampler.outPixels(), aPixels * aFactor);
      TLine aIn(static_cast<size_t>(aPixels)), aOut(static_cast<size_t>(aPixels * aFactor));
      for (TLRXComplex &aValue : aIn)
        aValue = TLRXComplex(aNormal(aRandom), aNormal(aRandom));
      aOversampler.process(aIn.data(), nullptr, aOut.data());
      for (int k = 0; k < aPixels; ++k)
        EXPECT_LT(std::abs(aOut[size_t(k * aFactor)] - aIn[size_t(k)]), 2e-5f) << k;
    }
  // Tones on bins: half the frequency per output sample at factor 2; a band
  // keeps a tone on its edge or inside and removes one outside.
  const SRangeBand aBand{-0.125, 0.25};
  const struct {
    double mFrequency;
    const SRangeBand *mBand;
    bool mPasses;
  } aTones[] = {{7.0 / 64, nullptr, true}, {-27.0 / 64, nullptr, true}, {0.25, &aBand, true}, {-0.125, &aBand, true},
                {3.0 / 64, &aBand, true}, {0.3125, &aBand, false}, {-0.15625, &aBand, false}, {0.5, &aBand, false}};
  CRangeOversampler aOversampler(64, 2);
  for (const auto &aTone : aTones) {
    SCOPED_TRACE(aTone.mFrequency);
    const double f = std::round(aTone.mFrequency * 64) / 64;
    TLine aOut(128);
    aOversampler.process(tone(f, 64).data(), aTone.mBand, aOut.data());
    const TLine aExpected = aTone.mPasses ? tone(f / 2, 128) : TLine(128);
    for (size_t i = 0; i < aOut.size(); ++i)
      EXPECT_LT(std::abs(aOut[i] - aExpected[i]), 1e-5f) << i;
  }
  EXPECT_EQ(tlrxRaisedCode([] { CRangeOversampler(0, 2); }), CTLRX_ERR_IMAGE_SIZES);
  EXPECT_EQ(tlrxRaisedCode([] { CRangeOversampler(64, 0); }), CTLRX_ERR_IMAGE_SIZES);
}

TEST(FringeFromPhase, MeanWrappedStepSkippingNullCellsAndTheirNeighbours) {
  for (const double aFringe : {0.13, -0.31}) {
    std::vector<float> aPhase(200);
    for (size_t i = 0; i < aPhase.size(); ++i)
      aPhase[i] = static_cast<float>(std::remainder(2 * CTLRX_PI * aFringe * double(i) + 1.0, 2 * CTLRX_PI));
    aPhase[10] = -999.0f;
    aPhase[11] = 3.0f; // off the ramp, but both its steps touch a null cell
    aPhase[12] = std::numeric_limits<float>::quiet_NaN();
    EXPECT_NEAR(fdfFringeFromPhase(aPhase.data(), 200, -999.0), aFringe, 1e-6);
  }
  const float aNulls[] = {-999.0f, 1.0f, std::numeric_limits<float>::quiet_NaN()};
  EXPECT_EQ(fdfFringeFromPhase(aNulls, 3, -999.0), 0.0);
  EXPECT_EQ(fdfFringeFromPhase(aNulls, 0, -999.0), 0.0);
}

// Fringes written by the simulator are found within 0.002 cycle per pixel in
// every group of 16 lines, also when a block of the master is null; noise and
// an empty estimator are rejected.
TEST_F(CommonBand, FringeEstimatorFindsKnownFringesOnSpeckleAndRejectsNoise) {
  for (const double aFringe : {0.077, -0.12}) {
    const std::string aRoot = tlrxSimulateSlc(mDir, "p", {"--lines", "64", "--pixels", "512", "--coherence", "0.8",
                                                          "--phase-ramp", "0," + std::to_string(aFringe)});
    STLRXTestSlc aM = tlrxReadSlc(aRoot + "_1");
    const STLRXTestSlc aS = tlrxReadSlc(aRoot + "_2");
    std::fill_n(aM.mCells.begin() + 5 * 512 + 100, 200, TLRXComplex(0, 0)); // null cells add nothing
    CFringeEstimator aEstimator(512);
    for (int l0 = 0; l0 < 64; l0 += 16) {
      aEstimator.reset();
      for (int l = l0; l < l0 + 16; ++l)
        aEstimator.add(&aM.mCells[size_t(l) * 512], &aS.mCells[size_t(l) * 512]);
      double aFound = 0, aSnr = 0;
      EXPECT_TRUE(aEstimator.result(aFound, aSnr));
      EXPECT_NEAR(aFound, aFringe, 0.002) << l0;
      EXPECT_GT(aSnr, 5 * CTLRX_FRINGE_MIN_SNR);
    }
  }
  std::mt19937 aRandom(9);
  std::normal_distribution<float> aNormal;
  CFringeEstimator aEstimator(512);
  double aFringe = 1, aSnr = 1;
  EXPECT_FALSE(aEstimator.result(aFringe, aSnr));
  EXPECT_EQ(aFringe, 0.0);
  for (int l = 0; l < 64; ++l) {
    TLine aM(512), aS(512);
    for (size_t x = 0; x < 512; ++x) {
      aM[x] = TLRXComplex(aNormal(aRandom), aNormal(aRandom));
      aS[x] = TLRXComplex(aNormal(aRandom), aNormal(aRandom));
    }
    aEstimator.add(aM.data(), aS.data());
  }
  EXPECT_FALSE(aEstimator.result(aFringe, aSnr));
  EXPECT_EQ(aFringe, 0.0);
  EXPECT_GT(aSnr, 0.0);
  EXPECT_LT(aSnr, CTLRX_FRINGE_MIN_SNR);
}

// Centroids 0.2 and -0.1, bandwidth 1 / 1.2: common band [-0.217, 0.317]
// around 0.05. Tones: unit gain at the centre, suppressed outside; per-column
// centroids, one pair beyond 0.5 whose band wraps; absent lines count as zero.
TEST(AzimuthBandFilter, TonesPassAtTheCommonCentreAndVanishOutsideTheCommonBand) {
  const int aHalf = CTLRX_AZIMUTH_FILTER_TAPS / 2;
  const std::vector<double> aMasterCentroid = {0.2, 0.2, 0.0, 0.45}, aSlaveCentroid = {-0.1, -0.1, 0.0, 0.55};
  const double aCentre[] = {0.05, 0.05, 0.0, 0.5};
  const CAzimuthBandFilter aFilter(4, aMasterCentroid, aSlaveCentroid, 1 / 1.2);
  const auto aRun = [&](const std::vector<double> &theFrequency, int theLine, bool theDropFirst) {
    std::vector<TLine> aLines(CTLRX_AZIMUTH_FILTER_TAPS, TLine(4));
    std::vector<const TLRXComplex *> aPointers;
    for (int k = 0; k < CTLRX_AZIMUTH_FILTER_TAPS; ++k) {
      for (size_t c = 0; c < 4; ++c)
        aLines[size_t(k)][c] = k < 3 && theDropFirst ? TLRXComplex(0, 0) : turn(theFrequency[c] * (theLine - aHalf + k));
      aPointers.push_back(k < 3 && theDropFirst ? nullptr : aLines[size_t(k)].data());
    }
    TLine aOut(4), aZeros(4);
    aFilter.filterLine(aPointers.data(), theLine, aOut.data());
    for (int k = 0; k < 3; ++k)
      aPointers[size_t(k)] = aLines[size_t(k)].data();
    aFilter.filterLine(aPointers.data(), theLine, aZeros.data());
    if (theDropFirst)
      EXPECT_EQ(aOut, aZeros);
    return aOut;
  };
  const TLine aAtCentre = aRun({aCentre[0], aCentre[1], aCentre[2], aCentre[3]}, 40, false);
  for (size_t c = 0; c < 4; ++c) {
    EXPECT_LT(std::abs(aAtCentre[c] - turn(aCentre[c] * 40)), 2e-4f) << c;
  }
  // -0.3 and 0.38 lie outside, near the band mirrored about 0.
  for (const auto &aOutside : {std::pair<double, double>{0.45, -0.45}, {-0.4, 0.4}, {-0.3, 0.38}}) {
    const TLine aOut = aRun({aOutside.first, aOutside.second, 0.0, 0.5}, 7, false);
    EXPECT_LT(std::abs(aOut[0]), 0.05) << aOutside.first;
    EXPECT_LT(std::abs(aOut[1]), 0.05) << aOutside.second;
  }
  // Columns 2 and 3 (common widths 0.833 and 0.733): 0.5 and 0.0 lie 0.5 away from their centres.
  const TLine aFar = aRun({0.0, 0.0, 0.5, 0.0}, 7, false);
  EXPECT_LT(std::abs(aFar[2]), 0.05);
  EXPECT_LT(std::abs(aFar[3]), 0.05);
  aRun({0.1, 0.3, -0.2, 0.4}, 2, true);
  EXPECT_EQ(tlrxRaisedCode([] { CAzimuthBandFilter(5, {0.1}, {0.1}, 0.8); }), CTLRX_ERR_SIZE_MISMATCH);
}
