// The slave resampler against truth made independently of it: band-limited
// speckle (osr 1.2) moved by a Fourier phase ramp, and a sum of sinusoids
// evaluated at the exact positions of an affine field; the edge, memory and
// block rules; shift rasters; Doppler centroids from a header and from data.
#include "tlrx_description_test_support.h"
#include "tlrx_fft.h"
#include "tlrx_interf_utility.h"
#include "tlrx_slave_resampler.h"
#include "tlrx_slc_test_support.h"
#include "tlrx_standard_header.h"
#include "tlrx_test_support.h"

#include <gtest/gtest.h>

#include <cmath>
#include <map>
#include <random>

namespace {

using TImage = TLRXTestImage;

CSlaveResampler::TLineReader readerOf(const TImage &theImage, int thePixels, std::map<int, int> *theCounts = nullptr) {
  return [&theImage, thePixels, theCounts](int32_t theLine, TLRXComplex *theCells) {
    std::copy_n(theImage.data() + size_t(theLine) * thePixels, thePixels, theCells);
    if (theCounts != nullptr)
      ++(*theCounts)[theLine];
  };
}

// Master lines theLines of the resampled slave (slave lines x pixels).
TImage resample(const TImage &theSlave, int theLines, int thePixels, int theMasterPixels, CShiftField &theField,
                std::vector<double> theCentroid, const std::vector<int> &theMasterLines) {
  CSlaveResampler aResampler(theLines, thePixels, theMasterPixels, theField, std::move(theCentroid),
                             readerOf(theSlave, thePixels));
  TImage aOut(theMasterLines.size() * size_t(theMasterPixels));
  for (size_t i = 0; i < theMasterLines.size(); ++i)
    aResampler.resampleLine(theMasterLines[i], aOut.data() + i * size_t(theMasterPixels));
  return aOut;
}

std::vector<int> lines(int theFrom, int theTo, int theStep = 1) {
  std::vector<int> aLines;
  for (int i = theFrom; i < theTo; i += theStep)
    aLines.push_back(i);
  return aLines;
}

// Mean coherence over fractional shifts 0.1 .. 0.9 in azimuth (and in range
// too unless theAzimuthOnly) of speckle centred at theCentre.
double meanCoherence(double theCentre, const std::vector<double> &theCentroid, bool theAzimuthOnly) {
  const int n = 96;
  double aSum = 0;
  int aCount = 0;
  for (double aDa = 0.1; aDa < 1.0; aDa += 0.2)
    for (double aDr = theAzimuthOnly ? 0.0 : 0.1; aDr < 1.0; aDr += theAzimuthOnly ? 1.0 : 0.2, ++aCount) {
      TImage aSlave, aTruth;
      tlrxSpeckle(n, n, theCentre, aDr, aDa, 100 + aCount, aSlave, aTruth);
      CPolynomialShiftField aField({aDr}, {aDa});
      aSum += tlrxCoherence(resample(aSlave, n, n, n, aField, theCentroid, lines(0, n)), aTruth, n, 10, n - 10);
    }
  return aSum / aCount;
}

} // namespace

TEST(SlaveResampler, ConstantFractionalShiftsMatchTheFourierTruth) {
  const double g = meanCoherence(0.0, {}, false);
  EXPECT_GT(g, 0.999);
  std::printf("speckle, shifts 0.1 .. 0.9 in both axes: mean coherence %.5f\n", g);
}

// Azimuth spectrum at 0.3 cycles per line: the centroid given, the kernel
// works on the spectrum moved to zero; left at zero, the data decorrelate.
TEST(SlaveResampler, DopplerCentroidIsMovedToZeroBeforeTheAzimuthPass) {
  const double aWith = meanCoherence(0.3, std::vector<double>(96, 0.3), true);
  const double aWithout = meanCoherence(0.3, {}, true);
  EXPECT_GT(aWith, 0.99);
  EXPECT_LT(aWithout, 0.9);
  EXPECT_GT(aWithout, 0.6);
  std::printf("centroid 0.3: coherence %.5f with it, %.5f without\n", aWith, aWithout);
}

// dR depends on y and dA on x (and a cross term): sinusoids of frequency up to
// 0.38 cycles per sample evaluated where the polynomials put each pixel.
TEST(SlaveResampler, AffineFieldWithCrossTermsMatchesDirectEvaluation) {
  const int n = 96;
  const std::vector<double> aRange = {0.3, 5e-4, 2e-3, 0.0, 1e-5}, aAzimuth = {-0.6, 3e-3, 4e-4, 1e-6};
  std::mt19937 aRandom(21);
  std::uniform_real_distribution<double> aFrequency(-0.38, 0.38);
  std::normal_distribution<double> aNormal;
  struct SWave {
    double mU, mV;
    std::complex<double> mA;
  };
  std::vector<SWave> aWaves;
  for (int k = 0; k < 6; ++k)
    aWaves.push_back({aFrequency(aRandom), aFrequency(aRandom), {aNormal(aRandom), aNormal(aRandom)}});
  auto aSignal = [&aWaves](double x, double y) {
    std::complex<double> s = 0;
    for (const SWave &w : aWaves)
      s += w.mA * std::polar(1.0, 2 * M_PI * (w.mU * x + w.mV * y));
    return TLRXComplex(s);
  };
  TImage aSlave(size_t(n * n)), aTruth(size_t(n * n));
  for (int y = 0; y < n; ++y)
    for (int x = 0; x < n; ++x) {
      aSlave[size_t(y * n + x)] = aSignal(x, y);
      aTruth[size_t(y * n + x)] =
          aSignal(x + fdfCoregPolyValue(aRange, x, y), y + fdfCoregPolyValue(aAzimuth, x, y));
    }
  CPolynomialShiftField aField(aRange, aAzimuth);
  const double g = tlrxCoherence(resample(aSlave, n, n, n, aField, {}, lines(0, n)), aTruth, n, 10, n - 12);
  EXPECT_GT(g, 0.999);
  std::printf("affine field with cross terms: coherence %.6f\n", g);
}

// The range pass of a slave line takes the range shift of the master line
// that sees it: exactly through the inverse azimuth polynomial, to first
// order without it. dA = 0.5 + 0.01 y: slave line j is master line
// (j - 0.5) / 1.01.
TEST(SlaveResampler, InverseAzimuthPolynomialMapsSlaveLinesBack) {
  const std::vector<double> aRange = {0.2, 0.0, 0.003}, aAzimuth = {0.5, 0.0, 0.01};
  CPolynomialShiftField aExact(aRange, aAzimuth, {-0.5 / 1.01, 0.0, -0.01 / 1.01}), aFirstOrder(aRange, aAzimuth);
  double aWith[4], aWithout[4];
  aExact.slaveLineColumns(500, 4, aWith);
  aFirstOrder.slaveLineColumns(500, 4, aWithout);
  for (int x = 0; x < 4; ++x) {
    const double aTruth = x + 0.2 + 0.003 * (500 - 0.5) / 1.01;
    EXPECT_NEAR(aWith[x], aTruth, 1e-9);
    EXPECT_GT(std::fabs(aWithout[x] - aTruth), 1e-4);
  }
}

// A constant stays constant away from the edges; a master pixel whose slave
// position is outside the slave is exactly 0 + 0i (here y < 5, x < 3, x > 31).
TEST(SlaveResampler, ConstantsAreKeptAndPositionsOutsideGiveZero) {
  const int aLines = 40, aPixels = 30, aMaster = 34;
  const TImage aSlave(size_t(aLines * aPixels), TLRXComplex(2.0f, -1.0f));
  CPolynomialShiftField aField({-2.5}, {-4.5});
  const TImage aOut = resample(aSlave, aLines, aPixels, aMaster, aField, {}, lines(0, aLines));
  for (int y = 0; y < aLines; ++y)
    for (int x = 0; x < aMaster; ++x) {
      const TLRXComplex v = aOut[size_t(y * aMaster + x)];
      const double p = y - 4.5, c = x - 2.5;
      if (p < 0 || c < 0 || c > aPixels - 1)
        EXPECT_EQ(v, TLRXComplex(0, 0)) << y << " " << x;
      else if (p >= 4 && p <= aLines - 5 && c >= 4 && c <= aPixels - 5)
        EXPECT_LT(std::abs(v - TLRXComplex(2.0f, -1.0f)), 1e-5) << y << " " << x;
      else
        EXPECT_NE(v, TLRXComplex(0, 0)) << y << " " << x;
    }
}

// Each slave line is read once, exactly the lines some pixel's kernel
// reaches, and no more are held than the spread of a line's shifts + 8.
TEST(SlaveResampler, LinesAreReadOnceAndMemoryFollowsTheShiftSpread) {
  const int aLines = 90, aPixels = 60, aMaster = 80;
  const std::vector<double> aRange = {0.4}, aAzimuth = {1.5, 0.02, 0.01};
  const TImage aSlave(size_t(aLines * aPixels), TLRXComplex(1.0f, 0.5f));
  std::map<int, int> aCounts, aNeeded;
  CPolynomialShiftField aField(aRange, aAzimuth);
  CSlaveResampler aResampler(aLines, aPixels, aPixels, aField, {}, readerOf(aSlave, aPixels, &aCounts));
  TImage aOut(aPixels);
  size_t aMaxHeld = 0;
  int64_t aSpread = 0;
  for (int y = 0; y < aMaster; ++y) {
    aResampler.resampleLine(y, aOut.data());
    aMaxHeld = std::max(aMaxHeld, aResampler.linesHeld());
    int64_t aLow = 1 << 30, aHigh = -1;
    for (int x = 0; x < aPixels; ++x) {
      const double p = y + fdfCoregPolyValue(aAzimuth, x, y), c = x + 0.4;
      if (p < 0 || p > aLines - 1 || c > aPixels - 1)
        continue;
      int64_t aFirst = 0;
      double aFraction = 0;
      fdfSplitPosition(p, aFirst, aFraction);
      aLow = std::min(aLow, aFirst);
      aHigh = std::max(aHigh, aFirst);
      for (int64_t j = std::max<int64_t>(0, aFirst - 3); j <= std::min<int64_t>(aLines - 1, aFirst + 4); ++j)
        aNeeded[int(j)] = 1;
    }
    aSpread = std::max(aSpread, aHigh - aLow);
  }
  EXPECT_EQ(aCounts, aNeeded);
  EXPECT_EQ(aResampler.linesRead(), int64_t(aNeeded.size()));
  EXPECT_LE(int64_t(aMaxHeld), aSpread + 8);
  EXPECT_GE(aMaxHeld, 8u);
}

// The result of a line depends on its number only: one resampler over all
// lines, a fresh one per block of 7, and one asked every third line agree
// bit for bit, Doppler phases included.
TEST(SlaveResampler, ResultsDoNotDependOnWhichLinesWereReadTogether) {
  const int n = 64;
  TImage aSlave, aTruth;
  tlrxSpeckle(n, n, 0.2, 0, 0, 5, aSlave, aTruth);
  const std::vector<double> aRange = {0.7, 1e-3, -2e-3}, aAzimuth = {1.3, -2e-3, 5e-3, 0, 1e-5};
  std::vector<double> aCentroid(n);
  for (int x = 0; x < n; ++x)
    aCentroid[size_t(x)] = 0.2 + 0.004 * x;
  CPolynomialShiftField aField(aRange, aAzimuth);
  const TImage aWhole = resample(aSlave, n, n, n, aField, aCentroid, lines(0, n));
  for (int aFirst = 0; aFirst < n; aFirst += 7) {
    const TImage aBlock = resample(aSlave, n, n, n, aField, aCentroid, lines(aFirst, std::min(n, aFirst + 7)));
    EXPECT_TRUE(std::equal(aBlock.begin(), aBlock.end(), aWhole.begin() + aFirst * n)) << aFirst;
  }
  const std::vector<int> aSparse = lines(1, n, 3);
  const TImage aSkipping = resample(aSlave, n, n, n, aField, aCentroid, aSparse);
  for (size_t i = 0; i < aSparse.size(); ++i)
    EXPECT_TRUE(std::equal(aSkipping.begin() + i * n, aSkipping.begin() + (i + 1) * n,
                           aWhole.begin() + aSparse[i] * n))
        << aSparse[i];
}

class SlaveResamplerFiles : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }
};

// Shift rasters: no-data cells and lines outside mean no shift; the range
// pass of a slave line takes that line of the range raster, clamped.
TEST_F(SlaveResamplerFiles, RasterShiftsAreReadWithNullsAsZero) {
  STLRXTestRaster aRange, aAzimuth;
  aRange.mHasNull = true;
  aRange.mNull = -9999;
  for (int l = 0; l < 4; ++l)
    for (int p = 0; p < 5; ++p) {
      aRange.mValues.push_back(0.1 * l + 0.01 * p - 0.2);
      aAzimuth.mValues.push_back(-0.3 + 0.05 * p);
    }
  aRange.mValues[1 * 5 + 2] = -9999;
  tlrxWriteTestRaster(mDir.file("dr"), aRange);
  tlrxWriteTestRaster(mDir.file("da"), aAzimuth);
  CRasterShiftField aField(mDir.file("dr"), mDir.file("da"), 4, 5);
  auto aStored = [](double theValue) { return double(float(theValue)); }; // FLOAT cells
  double aColumns[5], aLines[5];
  for (int y : {-1, 1, 3, 4}) {
    aField.masterLine(y, 5, aColumns, aLines);
    for (int p = 0; p < 5; ++p) {
      const bool aInside = y >= 0 && y < 4, aNull = y == 1 && p == 2;
      EXPECT_NEAR(aColumns[p], p + (aInside && !aNull ? aStored(0.1 * y + 0.01 * p - 0.2) : 0.0), 1e-12) << y << p;
      EXPECT_NEAR(aLines[p], y + (aInside ? aStored(-0.3 + 0.05 * p) : 0.0), 1e-12) << y << p;
    }
  }
  for (const auto &aCase : {std::pair<int, int>{-2, 0}, {2, 2}, {7, 3}}) {
    aField.slaveLineColumns(aCase.first, 5, aColumns);
    for (int p = 0; p < 5; ++p)
      EXPECT_NEAR(aColumns[p], p + aStored(0.1 * aCase.second + 0.01 * p - 0.2), 1e-12) << aCase.first << p;
  }
}

TEST_F(SlaveResamplerFiles, MissingHeaderAndSizeMismatchRaiseTheirCodes) {
  STLRXTestRaster aSmall;
  aSmall.mValues.assign(20, 0.0);
  tlrxWriteTestRaster(mDir.file("small"), aSmall);
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { CRasterShiftField(mDir.file("small"), mDir.file("none"), 4, 5); }, &aMessage), 261122);
  EXPECT_NE(aMessage.find("none_hdr"), std::string::npos) << aMessage;
  for (const auto &aSize : {std::pair<int, int>{5, 5}, {4, 6}}) {
    EXPECT_EQ(tlrxCodeOf([&] { CRasterShiftField(mDir.file("small"), mDir.file("small"), aSize.first,
                                                 aSize.second); }, &aMessage), 652807);
    EXPECT_NE(aMessage.find(mDir.file("small")), std::string::npos) << aMessage;
  }
}

// f = c0 + c1 t + c2 t^2 of the absolute range time, over the PRF, wrapped.
TEST_F(SlaveResamplerFiles, DopplerFromHeaderFollowsTheRangeTimePolynomial) {
  const double aPrf = 1679.9, aRate = 18.96e6, aStart = 0.0055, c[] = {-2500.0, 4.0e5, 2.0e9};
  auto aHeader = [&](const char *theDropped) {
    auto aDescription = std::make_unique<CDescription>();
    fdfDeclareStandardHeader(*aDescription);
    aDescription->getField("ChannelInfo.PulseRepetitionFrequency").setDouble(aPrf);
    aDescription->getField("ChannelInfo.RangeSamplingRate").setDouble(aRate);
    aDescription->getField("ChannelInfo.RangeTimeFirstPixel").setDouble(aStart);
    CDescriptionField &aCoeffs = aDescription->getField("ChannelInfo.DopplerCentroidCoeff");
    aCoeffs.setNumberOfElements(3);
    for (int i = 0; i < 3; ++i)
      aCoeffs.setDouble(i, c[i]);
    if (theDropped != nullptr)
      aDescription->getField(theDropped).clear();
    return aDescription;
  };
  std::vector<double> aCentroid;
  ASSERT_TRUE(fdfDopplerFromHeader(*aHeader(nullptr), 3000, aCentroid));
  ASSERT_EQ(aCentroid.size(), 3000u);
  for (int x = 0; x < 3000; x += 7) {
    const double t = aStart + x / aRate, f = (c[0] + c[1] * t + c[2] * t * t) / aPrf;
    EXPECT_NEAR(aCentroid[size_t(x)], f - std::floor(f + 0.5), 1e-9) << x;
    EXPECT_TRUE(aCentroid[size_t(x)] >= -0.5 && aCentroid[size_t(x)] < 0.5);
  }
  for (const char *aKey : {"ChannelInfo.DopplerCentroidCoeff", "ChannelInfo.PulseRepetitionFrequency",
                           "ChannelInfo.RangeSamplingRate", "ChannelInfo.RangeTimeFirstPixel"}) {
    std::vector<double> aUntouched = {9.0};
    EXPECT_FALSE(fdfDopplerFromHeader(*aHeader(aKey), 10, aUntouched)) << aKey;
    EXPECT_EQ(aUntouched, std::vector<double>{9.0}) << aKey;
  }
  auto aZeroPrf = aHeader(nullptr);
  aZeroPrf->getField("ChannelInfo.PulseRepetitionFrequency").setDouble(0.0);
  EXPECT_FALSE(fdfDopplerFromHeader(*aZeroPrf, 10, aCentroid));
}

// The correlation estimator on speckle whose azimuth spectrum is moved to
// f(x) = f0 + k x per column: constant, near the wrap, and crossing it.
TEST(SlaveResamplerDoppler, CentroidIsEstimatedFromTheData) {
  const int n = 512;
  TImage aSlave, aTruth;
  tlrxSpeckle(n, n, 0.0, 0, 0, 9, aSlave, aTruth);
  for (const auto &aCase : {std::pair<double, double>{0.3, 0.0}, {-0.45, 0.0}, {0.4, 4e-4}}) {
    TImage aMoved = aSlave;
    for (int y = 0; y < n; ++y)
      for (int x = 0; x < n; ++x)
        aMoved[size_t(y * n + x)] *= TLRXComplex(std::polar(1.0, 2 * M_PI * (aCase.first + aCase.second * x) * y));
    const std::vector<double> aEstimate = fdfEstimateDoppler(readerOf(aMoved, n), n, n);
    ASSERT_EQ(aEstimate.size(), size_t(n));
    for (int x = 0; x < n; x += 15) {
      EXPECT_NEAR(std::remainder(aEstimate[size_t(x)] - aCase.first - aCase.second * x, 1.0), 0.0, 0.01) << aCase.first << " " << x;
      EXPECT_TRUE(aEstimate[size_t(x)] >= -0.5 && aEstimate[size_t(x)] < 0.5);
    }
  }
  const TImage aZeros(size_t(n * n), TLRXComplex(0, 0));
  EXPECT_EQ(fdfEstimateDoppler(readerOf(aZeros, n), n, n), std::vector<double>(size_t(n), 0.0));
}
