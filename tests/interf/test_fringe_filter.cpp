// The fringe-adaptive filter: its kernel against scenes of known truth (pure
// and noisy fringes, white noise and its expected pass ratios, zero cells),
// and the step program's result file, header and failures.
#include "tlrx_description_section.h"
#include "tlrx_description_test_support.h"
#include "tlrx_errors.h"
#include "tlrx_fringe_filter.h"
#include "tlrx_header_expect.h"
#include "tlrx_raster_file.h"
#include "tlrx_slc_test_support.h"
#include "tlrx_standard_header.h"
#include "tlrx_test_support.h"
#include "tlrx_trace_test_support.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <complex>
#include <cstring>
#include <random>
#include <stdexcept>

namespace {

using TCell = std::complex<float>;
using TImage = std::vector<TCell>;
constexpr double sPi = 3.14159265358979323846;

// theImage (theLines x thePixels) through the kernel, theRows rows of patches
// at a time, lines taken as soon as they are ready.
TImage filtered(const TImage &theImage, int theLines, int thePixels, double theLowSnr, double theWidth,
                SFringeFilterStats *theStats = nullptr, int theRows = 1) {
  CFringeFilter aFilter(thePixels, theLowSnr, theWidth, theRows);
  TImage aOut(theImage.size() + size_t(thePixels)); // a spare line takes any extra one
  size_t aTaken = 0;
  const auto aTake = [&](int32_t theReady) {
    for (int32_t i = 0; i < theReady; ++i, aTaken += size_t(thePixels))
      aFilter.popLine(&aOut[std::min(aTaken, theImage.size())]);
  };
  for (int l = 0; l < theLines; ++l)
    aTake(aFilter.pushLine(&theImage[size_t(l) * size_t(thePixels)]));
  aTake(aFilter.finish());
  EXPECT_EQ(aTaken, theImage.size());
  aOut.resize(theImage.size());
  if (theStats != nullptr)
    *theStats = aFilter.stats();
  return aOut;
}

TImage fringe(int theLines, int thePixels, double theFy, double theFx) {
  TImage aImage;
  for (int l = 0; l < theLines; ++l)
    for (int p = 0; p < thePixels; ++p)
      aImage.push_back(TCell(std::polar(1.0, 2 * sPi * (theFy * l + theFx * p))));
  return aImage;
}

// Unit-power circular Gaussian noise.
TImage noise(size_t theCount, unsigned theSeed) {
  std::mt19937 aRandom(theSeed);
  std::normal_distribution<float> aNormal(0.0F, float(std::sqrt(0.5)));
  TImage aImage(theCount);
  for (TCell &aCell : aImage)
    aCell = TCell(aNormal(aRandom), aNormal(aRandom));
  return aImage;
}

// theCell(index) for the cells 32 or more from every border, whose patches
// all lie inside the image.
template <typename F> void forInterior(int theLines, int thePixels, F theCell) {
  for (int l = 32; l < theLines - 32; ++l)
    for (int p = 32; p < thePixels - 32; ++p)
      theCell(size_t(l) * size_t(thePixels) + size_t(p));
}

// Circular spread sqrt(-2 ln |mean e^(i (arg a - arg b))|) inside the image.
double phaseSpread(const TImage &theA, const TImage &theB, int theLines, int thePixels) {
  std::complex<double> aSum;
  int aCount = 0;
  forInterior(theLines, thePixels, [&](size_t i) {
    aSum += std::polar(1.0, double(std::arg(theA[i]) - std::arg(theB[i])));
    ++aCount;
  });
  return std::sqrt(-2.0 * std::log(std::abs(aSum) / aCount));
}

} // namespace

// A fringe on a frequency bin passes at unit gain: phase and magnitude kept
// wherever the patches lie inside the image, every patch centred on it.
TEST(FringeFilter, PureFringeKeepsPhaseAndMagnitude) {
  const int n = 100, m = 120;
  const TImage aIn = fringe(n, m, 3.0 / 32, -5.0 / 32);
  SFringeFilterStats aStats;
  const TImage aOut = filtered(aIn, n, m, 0.25, 2.0, &aStats);
  double aPhase = 0, aMagnitude = 0;
  forInterior(n, m, [&](size_t i) {
    aPhase = std::max(aPhase, std::abs(double(std::arg(aOut[i] * std::conj(aIn[i])))));
    aMagnitude = std::max(aMagnitude, std::abs(double(std::abs(aOut[i])) - 1.0));
  });
  EXPECT_LT(aPhase, 1e-3);
  EXPECT_LT(aMagnitude, 0.01);
  EXPECT_EQ(aStats.mPatches, 8 * 9); // starts -16..96 by 16, and -16..112
  EXPECT_EQ(aStats.mAboveThreshold, aStats.mPatches);
}

// White noise: the power passed matches the band's reference ratios, and its
// patches have a small SNR, so the band stays at zero frequency.
TEST(FringeFilter, WhiteNoisePassRatioAndSnr) {
  const int n = 160;
  const TImage aIn = noise(size_t(n) * n, 11);
  const struct {
    double mWidth, mRatio;
  } aCases[] = {{1, 0.30}, {2, 0.149}, {4, 0.049}};
  for (const auto &aCase : aCases) {
    SCOPED_TRACE(aCase.mWidth);
    SFringeFilterStats aStats;
    const TImage aOut = filtered(aIn, n, n, 0.25, aCase.mWidth, &aStats);
    double aPowerIn = 0, aPowerOut = 0;
    forInterior(n, n, [&](size_t i) {
      aPowerIn += std::norm(aIn[i]);
      aPowerOut += std::norm(aOut[i]);
    });
    EXPECT_NEAR(aPowerOut / aPowerIn, aCase.mRatio, 0.15 * aCase.mRatio);
    EXPECT_EQ(aStats.mPatches, 11 * 11);
    EXPECT_EQ(aStats.mAboveThreshold, 0);
    EXPECT_GT(aStats.mSnrSum / aStats.mPatches, 0.0);
    EXPECT_LT(aStats.mSnrSum / aStats.mPatches, 0.012);
  }
}

// A single-look fringe at coherence 0.7: SNR about g^2 as the fringe and
// noise powers predict, every patch follows the fringe, and the phase noise
// drops.
TEST(FringeFilter, NoisyFringeLosesPhaseNoise) {
  const int n = 192;
  const double g = 0.7;
  const TImage aTruth = fringe(n, n, 3.0 / 32, 5.0 / 32), aNoise = noise(size_t(n) * n, 3);
  TImage aIn(aTruth.size());
  for (size_t i = 0; i < aIn.size(); ++i)
    aIn[i] = aTruth[i] * float(g) + aNoise[i] * float(std::sqrt(1 - g * g));
  SFringeFilterStats aStats;
  const TImage aOut = filtered(aIn, n, n, 0.25, 2.0, &aStats);
  // Fringe power 1024 g^2 in its bin and noise 1 - g^2 in every bin, against
  // the patch's 1024: (1024 g^2 + 16 (1 - g^2) - 16) / 1024 = g^2 (1 - 1/64).
  const double aSnr = g * g * (1 - 1.0 / 64);
  EXPECT_NEAR(aStats.mSnrSum / aStats.mPatches, aSnr, 0.1 * aSnr);
  EXPECT_EQ(aStats.mAboveThreshold, aStats.mPatches);
  const double aBefore = phaseSpread(aIn, aTruth, n, n), aAfter = phaseSpread(aOut, aTruth, n, n);
  EXPECT_GT(aBefore / aAfter, 2.0) << aBefore << " -> " << aAfter;
}

// Width 0 passes every frequency: the overlap-add alone gives the input back,
// borders included, whatever the size; zero and non-finite cells are 0 + 0i
// in the output, at any width.
TEST(FringeFilter, OverlapWeightsSumToOneAndZerosStayZero) {
  const struct {
    int mLines, mPixels;
  } aSizes[] = {{37, 53}, {16, 16}, {1, 1}, {5, 200}, {64, 33}, {17, 48}};
  for (const auto &aSize : aSizes) {
    SCOPED_TRACE(std::to_string(aSize.mLines) + " x " + std::to_string(aSize.mPixels));
    const size_t aCount = size_t(aSize.mLines) * size_t(aSize.mPixels);
    for (const TImage &aIn : {TImage(aCount, TCell(1, 0)), noise(aCount, 5)}) {
      const TImage aOut = filtered(aIn, aSize.mLines, aSize.mPixels, 0.25, 0.0);
      for (size_t i = 0; i < aCount; ++i)
        ASSERT_LT(std::abs(aOut[i] - aIn[i]), 1e-5) << i;
    }
  }
  const int n = 70;
  TImage aIn = fringe(n, n, 0.1, 0.2);
  for (int l = 20; l < 30; ++l)
    for (int p = 40; p < 52; ++p)
      aIn[size_t(l) * n + p] = TCell();
  for (size_t i = 0; i < aIn.size(); i += 37)
    aIn[i] = TCell();
  aIn[size_t(5) * n + 5] = TCell(NAN, 0);
  aIn[size_t(60) * n + 9] = TCell(0, INFINITY);
  for (const double aWidth : {0.0, 2.0}) {
    const TImage aOut = filtered(aIn, n, n, 0.25, aWidth);
    for (size_t i = 0; i < aIn.size(); ++i) {
      const bool aNoData = aIn[i] == TCell() || !std::isfinite(std::abs(aIn[i]));
      ASSERT_TRUE(aNoData ? aOut[i] == TCell() : std::isfinite(std::abs(aOut[i])) && aOut[i] != TCell()) << i;
    }
  }
}

// Any thread count and any number of patch rows filtered together give the
// bytes and patch statistics of one: sizes whose last patch row and column
// are cut short, several bands, no-data cells.
TEST(FringeFilter, ThreadCountDoesNotChangeTheResult) {
  const struct {
    int mLines, mPixels;
    double mWidth;
  } aCases[] = {{37, 53, 2.0}, {141, 333, 3.0}, {1, 40, 2.0}, {50, 5, 0.0}};
  for (const auto &aCase : aCases) {
    SCOPED_TRACE(std::to_string(aCase.mLines) + " x " + std::to_string(aCase.mPixels));
    const size_t aCount = size_t(aCase.mLines) * size_t(aCase.mPixels);
    TImage aIn = fringe(aCase.mLines, aCase.mPixels, 0.07, -0.15);
    const TImage aNoise = noise(aCount, 11);
    for (size_t i = 0; i < aCount; ++i)
      aIn[i] = (i % 7 == 3 ? TCell() : aIn[i] + 0.8F * aNoise[i]);
    std::vector<TImage> aOuts;
    std::vector<SFringeFilterStats> aStats;
    for (const int aThreads : CTLRX_TEST_THREADS)
      for (const int aRows : {1, 3, 8}) {
        const CTestThreads aSetting(aThreads);
        aStats.emplace_back();
        aOuts.push_back(filtered(aIn, aCase.mLines, aCase.mPixels, 0.25, aCase.mWidth, &aStats.back(), aRows));
      }
    for (size_t t = 1; t < aOuts.size(); ++t) {
      EXPECT_EQ(0, std::memcmp(aOuts[t].data(), aOuts[0].data(), aCount * sizeof(TCell))) << "run " << t;
      EXPECT_EQ(aStats[t].mPatches, aStats[0].mPatches);
      EXPECT_EQ(aStats[t].mAboveThreshold, aStats[0].mAboveThreshold);
      EXPECT_EQ(aStats[t].mSnrSum, aStats[0].mSnrSum);
    }
    // Patches start every 16 lines and columns from -16.
    EXPECT_EQ(aStats[0].mPatches, int64_t((aCase.mLines + 31) / 16) * ((aCase.mPixels + 31) / 16));
  }
}

// Lines come out band by band, and must be taken before more go in.
TEST(FringeFilter, ReadyLinesMustBeTakenFirst) {
  CFringeFilter aFilter(8, 0.25, 2.0);
  TImage aLine(8, TCell(1, 1));
  for (int l = 0; l < 31; ++l) // lines 0..15 wait for the patches starting at line 16
    ASSERT_EQ(aFilter.pushLine(aLine.data()), 0) << l;
  EXPECT_EQ(aFilter.pushLine(aLine.data()), 16);
  EXPECT_THROW(aFilter.pushLine(aLine.data()), std::logic_error);
  EXPECT_THROW(aFilter.finish(), std::logic_error);
  for (int l = 0; l < 16; ++l)
    aFilter.popLine(aLine.data());
  EXPECT_THROW(aFilter.popLine(aLine.data()), std::logic_error);
  EXPECT_EQ(aFilter.finish(), 16);
  EXPECT_THROW(CFringeFilter(0, 0.25, 2.0), std::invalid_argument);
  EXPECT_THROW(CFringeFilter(8, 0.25, 2.0, 0), std::invalid_argument);
  EXPECT_THROW(CFringeFilter(8, 0.25, 2.0, 65), std::invalid_argument);
  // Three rows at a time: lines 0..31 wait for the rows from -16, 0 and 16,
  // the next 48 for the three rows after.
  CFringeFilter aRows(8, 0.25, 2.0, 3);
  for (int l = 0; l < 47; ++l)
    ASSERT_EQ(aRows.pushLine(aLine.data()), 0) << l;
  EXPECT_EQ(aRows.pushLine(aLine.data()), 32);
  for (int l = 0; l < 32; ++l)
    aRows.popLine(aLine.data());
  for (int l = 0; l < 47; ++l)
    ASSERT_EQ(aRows.pushLine(aLine.data()), 0) << l;
  EXPECT_EQ(aRows.pushLine(aLine.data()), 48);
}

// ------------------------------------------------------------ step program

namespace {

class AdaptiveFilter : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }

  // A FLOAT_COMPLEX raster of theUnits; theNull sets a null value.
  std::string write(const std::string &theName, int theLines, int thePixels, const TImage &theCells,
                    const char *theUnits, const float *theNull = nullptr) {
    STLRXTestRaster aRaster;
    aRaster.mLines = theLines;
    aRaster.mPixels = thePixels;
    aRaster.mCellType = "FLOAT_COMPLEX";
    aRaster.mDataUnits = theUnits;
    aRaster.mHasNull = theNull != nullptr;
    aRaster.mNull = theNull != nullptr ? *theNull : 0.0;
    aRaster.mCells = theCells;
    tlrxWriteTestRaster(mDir.file(theName), aRaster);
    return mDir.file(theName);
  }

  void run(std::vector<std::string> theArgs) {
    theArgs.insert(theArgs.begin(), "tlrx_fringe_filter");
    mCode = tlrxCodeOf([&] { EXPECT_EQ(tlrxCallStep(tlrx_fringe_filter, theArgs), 0); }, &mMessage);
  }

  int32_t mCode = 0;
  std::string mMessage;
};

} // namespace

// The result is the kernel's on the input with its null cells as 0 + 0i;
// units "FLATTENED INTERFEROGRAMME" are kept, others become INTERFEROGRAMME.
TEST_F(AdaptiveFilter, WritesTheFilteredInterferogram) {
  const int n = 40, m = 50;
  const float aNull = -7.0F;
  TImage aCells = noise(size_t(n) * m, 9), aExpected = aCells;
  for (size_t i = 0; i < aCells.size(); i += 13) {
    aCells[i] = TCell(aNull, aNull);
    aExpected[i] = TCell();
  }
  aExpected = filtered(aExpected, n, m, -1.0, 1.5);
  for (const char *aUnits : {"FLATTENED INTERFEROGRAMME", "SLC"}) {
    SCOPED_TRACE(aUnits);
    const std::string aIn = write("in_dint", n, m, aCells, aUnits, &aNull), aOut = mDir.file("r_fint");
    ASSERT_TRUE(tlrxStartTrace());
    run({aIn, aOut, "-1", "1.5"});
    ASSERT_EQ(mCode, 0) << mMessage;
    const std::string aTrace = tlrxStopTrace(mDir.path());
    EXPECT_NE(aTrace.find("*** fringe adaptive filter of the interferogram ***\n"), std::string::npos);
    EXPECT_NE(aTrace.find("low SNR threshold: -1\nwidth: 1.5 pixels\n"), std::string::npos);
    const STLRXTestSlc aResult = tlrxReadSlc(aOut);
    ASSERT_EQ(aResult.mCells.size(), aExpected.size());
    for (size_t i = 0; i < aExpected.size(); ++i)
      ASSERT_EQ(aResult.mCells[i], aExpected[i]) << i;
    tlrxExpectHeader(aOut, "CellType=FLOAT_COMPLEX;NrOfLinesPerImage=40;NrOfPixelsPerLine=50;NullCellValue=0;"
                           "DataUnits=" + std::string(aUnits[0] == 'F' ? aUnits : "INTERFEROGRAMME") +
                               ";FilesList=" + aIn);
    EXPECT_NE(tlrxReadFile(mDir.file("Process.log")).find("fringe filter: 20 of 20 patches above the low SNR "
                                                          "threshold -1 (100.0 %)"),
              std::string::npos);
  }
}

TEST_F(AdaptiveFilter, FailuresRaiseTheirCodes) {
  const std::string aIn = write("in", 4, 4, TImage(16, TCell(1, 0)), "INTERFEROGRAMME"), o = mDir.file("o");
  STLRXTestRaster aFloat;
  aFloat.mValues.assign(20, 1.0);
  tlrxWriteTestRaster(mDir.file("float"), aFloat);
  tlrxExpectStepFailures(
      tlrx_fringe_filter, {
      {{aIn, o, "0.25"}, CTLRX_ERR_ARGUMENTS, ""},
      {{aIn, o, "x", "2"}, CTLRX_ERR_ARGUMENTS, "low SNR threshold: not a number [x]"},
      {{aIn, o, "0.25", "0"}, CTLRX_ERR_ARGUMENTS, "width: not above 0 [0]"},
      {{mDir.file("none"), o, "0.25", "2"}, CTLRX_ERR_FILE_OPEN, mDir.file("none") + "_hdr"},
      {{mDir.file("float"), o, "0.25", "2"}, CTLRX_ERR_IMAGES_INCOMPATIBLE,
       "FLOAT (input file 1: " + mDir.file("float") + ")"},
      {{aIn, aIn, "0.25", "2"}, CTLRX_ERR_PARAMETER_FILE, aIn},
      },
      o);

  EXPECT_EQ(tlrxReadSlc(aIn).mCells, TImage(16, TCell(1, 0))) << "the input is untouched";
}
