// Common-band filters and range oversampling: tones and bands against direct
// formulas, and the geometric and Doppler decorrelation of simulated pairs
// (tlrx_simulate slc) undone by filtering both images to their common band.
#include "tlrx_command_test_support.h"
#include "tlrx_common_band.h"

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

double maxAbs(const TLine &theLine) {
  double aMax = 0;
  for (const TLRXComplex &aValue : theLine)
    aMax = std::max(aMax, double(std::abs(aValue)));
  return aMax;
}

// |sum m conj(s) e^(-2 pi i f x)| / sqrt(sum |m|^2 sum |s|^2) over lines [theFirst, theEnd).
double coherence(const std::vector<TLine> &theM, const std::vector<TLine> &theS, double theFringe, size_t theFirst = 0,
                 size_t theEnd = 0) {
  std::complex<double> aSum = 0;
  double aM = 0, aS = 0;
  for (size_t l = theFirst; l < (theEnd == 0 ? theM.size() : theEnd); ++l)
    for (size_t x = 0; x < theM[l].size(); ++x) {
      const std::complex<double> m(theM[l][x]), s(theS[l][x]);
      aSum += m * std::conj(s) * std::polar(1.0, -2 * CTLRX_PI * theFringe * double(x));
      aM += std::norm(m);
      aS += std::norm(s);
    }
  return std::abs(aSum) / std::sqrt(aM * aS);
}

class CommonBand : public ::testing::Test {
protected:
  CTempDir mDir;
  // The lines of ROOT_1 and ROOT_2 of tlrx_simulate slc (FLOAT_COMPLEX cells).
  void simulate(std::vector<std::string> theOptions, int thePixels, std::vector<TLine> &theM, std::vector<TLine> &theS) {
    theOptions.insert(theOptions.begin(), {"slc", "--out", mDir.file("p"), "--pixels", std::to_string(thePixels)});
    const STLRXRun aRun = tlrxRun("tlrx_simulate", theOptions, mDir.path());
    ASSERT_EQ(aRun.mExitStatus, 0) << aRun.mOutput;
    for (int k = 0; k < 2; ++k) {
      const std::string aBytes = tlrxReadFile(mDir.file(k == 0 ? "p_1" : "p_2"));
      std::vector<TLine> &aLines = k == 0 ? theM : theS;
      aLines.assign(aBytes.size() / (8 * size_t(thePixels)), TLine(size_t(thePixels)));
      for (size_t l = 0; l < aLines.size(); ++l)
        std::memcpy(aLines[l].data(), aBytes.data() + l * 8 * size_t(thePixels), 8 * size_t(thePixels));
    }
  }
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
    if (aTone.mPasses) {
      const TLine aExpected = tone(f / 2, 128);
      for (size_t i = 0; i < aOut.size(); ++i)
        EXPECT_LT(std::abs(aOut[i] - aExpected[i]), 1e-5f) << i;
    } else {
      EXPECT_LT(maxAbs(aOut), 1e-5);
    }
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
    std::vector<TLine> aM, aS;
    simulate({"--lines", "64", "--coherence", "0.8", "--phase-ramp", "0," + std::to_string(aFringe)}, 512, aM, aS);
    for (size_t x = 100; x < 300; ++x)
      aM[5][x] = 0; // null cells add nothing
    CFringeEstimator aEstimator(512);
    for (size_t l0 = 0; l0 < aM.size(); l0 += 16) {
      aEstimator.reset();
      for (size_t l = l0; l < l0 + 16; ++l)
        aEstimator.add(aM[l].data(), aS[l].data());
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

// A range band shift of 0.2 bandwidth: coherence 0.8 and a fringe of 0.2 /
// 1.2 cycle per pixel; the estimated fringe and the common bands through the
// oversampler bring the coherence to 0.97 or more, while the bands swapped
// (the wrong end of each image kept) lower it to (b - 3f) / (b - f) = 0.5:
// master bin k pairs with slave bin k - f, and both are kept for k in
// [2f - b/2, b/2 - f] only.
TEST_F(CommonBand, RangeCommonBandsUndoTheGeometricDecorrelation) {
  std::vector<TLine> aM, aS;
  simulate({"--lines", "128", "--coherence", "1", "--range-band-shift", "0.2", "--seed", "4"}, 512, aM, aS);
  const double b = 1 / 1.2, aTruth = 0.2 * b;
  CFringeEstimator aEstimator(512);
  for (size_t l = 0; l < aM.size(); ++l)
    aEstimator.add(aM[l].data(), aS[l].data());
  double aFringe = 0, aSnr = 0;
  ASSERT_TRUE(aEstimator.result(aFringe, aSnr));
  EXPECT_NEAR(aFringe, aTruth, 0.002);
  EXPECT_NEAR(coherence(aM, aS, aTruth), 0.8, 0.03);
  SRangeBand aMasterBand, aSlaveBand;
  ASSERT_TRUE(fdfCommonRangeBands(aFringe, b, aMasterBand, aSlaveBand));
  CRangeOversampler aOversampler(512, 2);
  const auto aFiltered = [&](const SRangeBand &theMaster, const SRangeBand &theSlave) {
    std::vector<TLine> aMo(aM.size(), TLine(1024)), aSo(aS.size(), TLine(1024));
    for (size_t l = 0; l < aM.size(); ++l) {
      aOversampler.process(aM[l].data(), &theMaster, aMo[l].data());
      aOversampler.process(aS[l].data(), &theSlave, aSo[l].data());
    }
    return coherence(aMo, aSo, aFringe / 2);
  };
  EXPECT_GE(aFiltered(aMasterBand, aSlaveBand), 0.97);
  EXPECT_NEAR(aFiltered(aSlaveBand, aMasterBand), 0.5, 0.03);
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

// Simulated centroids 0.2 and -0.1: coherence 1 - 0.3 x 1.2 = 0.64 before, 0.95
// or more once both images are filtered to the common band.
TEST_F(CommonBand, AzimuthFilterRecoversTheCoherenceOfDifferentDopplerCentroids) {
  std::vector<TLine> aM, aS;
  simulate({"--lines", "512", "--coherence", "1", "--doppler", "0.2,-0.1", "--seed", "6"}, 128, aM, aS);
  EXPECT_NEAR(coherence(aM, aS, 0), 0.64, 0.03);
  const CAzimuthBandFilter aFilter(128, std::vector<double>(128, 0.2), std::vector<double>(128, -0.1), 1 / 1.2);
  const int aHalf = CTLRX_AZIMUTH_FILTER_TAPS / 2;
  std::vector<TLine> aMo(aM.size(), TLine(128)), aSo(aS.size(), TLine(128));
  for (int l = 0; l < int(aM.size()); ++l) {
    std::vector<const TLRXComplex *> aMl, aSl;
    for (int k = l - aHalf; k <= l + aHalf; ++k) {
      const bool aInside = k >= 0 && k < int(aM.size());
      aMl.push_back(aInside ? aM[size_t(k)].data() : nullptr);
      aSl.push_back(aInside ? aS[size_t(k)].data() : nullptr);
    }
    aFilter.filterLine(aMl.data(), l, aMo[size_t(l)].data());
    aFilter.filterLine(aSl.data(), l, aSo[size_t(l)].data());
  }
  EXPECT_GE(coherence(aMo, aSo, 0, aHalf, aM.size() - aHalf), 0.95);
}
