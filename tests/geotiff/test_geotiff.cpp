// GeoTIFF quick-looks: stretch rules against direct formulas, conversions
// read back with libtiff/libgeotiff, the argument vector, progress,
// interruption, temporaries, and bad input with no TIFF left behind.
#include <gtest/gtest.h>
#include <algorithm>
#include <cmath>
#include <filesystem>
#include <random>
#include <sstream>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>
#include "tlrx_command_test_support.h"
#include "tlrx_enviroment.h"
#include "tlrx_geotiff_file.h"
#include "tlrx_geotiff_georef.h"
#include "tlrx_geotiff_stretch.h"
#include "tlrx_geotiff_test_support.h"
#include "tlrx_generic_utility.h"
#include "tlrx_platform.h"
#include "tlrx_raster_to_geotiff.h"

namespace {

constexpr double sPi = 3.14159265358979323846;
constexpr double sThird = 1.0 / 3.0;

// Mean of the values (NaN: no data) in the central third, every second row and column.
template <typename T> double centralThirdMean(const std::vector<T> &theValues, int theRows, int theCols) {
  double aSum = 0.0;
  int aCount = 0;
  for (int r = theRows / 2 - theRows / 6; r <= theRows / 2 + theRows / 6; r += 2)
    for (int c = theCols / 2 - theCols / 6; c <= theCols / 2 + theCols / 6; c += 2)
      if (!std::isnan(theValues[size_t(r) * theCols + c])) {
        aSum += theValues[size_t(r) * theCols + c];
        ++aCount;
      }
  return aSum / aCount;
}

int roundHalfUp(double theValue) { return static_cast<int>(std::floor(theValue + 0.5)); }

CTiffSample sampleOf(std::initializer_list<double> theValues) {
  CTiffSample aSample;
  for (double aValue : theValues)
    aSample.add(aValue);
  return aSample;
}

// Every pixel of theTiff is the level of its display value (NaN: no data,
// level 255); centred levels put 0 on level 127.
template <typename T>
void expectLevels(const STLRXTiffImage &theTiff, const std::vector<T> &theDisplay, double theScale, bool theCentred) {
  ASSERT_EQ(theTiff.mPixels.size(), theDisplay.size());
  for (size_t i = 0; i < theDisplay.size(); ++i) {
    const int aLevel = std::isnan(theDisplay[i]) ? 0 : roundHalfUp(theScale * theDisplay[i]);
    ASSERT_EQ(theTiff.mPixels[i], std::isnan(theDisplay[i]) ? 255
                                  : theCentred             ? std::clamp(127 + aLevel, 0, 254)
                                                           : std::min(254, aLevel))
        << i;
  }
}

// What a reader of the quick-look's header does with a grey level.
struct SHeaderStretch {
  double mMin, mMax, mScale, mExponent, mNull;
  int mRowScale, mColScale, mLines, mPixels;
  std::string mCellType;
  double value(int theLevel) const { return mMin + std::pow(theLevel / mScale, 1.0 / mExponent); }
};

std::vector<float> rampValues(int theRows, int theCols) {
  std::vector<float> aValues(size_t(theRows) * theCols);
  for (int r = 0; r < theRows; ++r)
    for (int c = 0; c < theCols; ++c)
      aValues[size_t(r) * theCols + c] = static_cast<float>(1 + (r * 7 + c * 13) % 50);
  return aValues;
}

// The level of a block mean of theValues (rows theRows x cols theCols of
// cells, block i, j), 255 when the block holds no valid cell.
int blockLevel(const std::vector<float> &theValues, int theCols, int theRowRed, int theColRed, int i, int j,
               double theScale, float theNull) {
  double aSum = 0.0;
  int aCount = 0;
  for (int r = theRowRed * i; r < theRowRed * (i + 1); ++r)
    for (int c = theColRed * j; c < theColRed * (j + 1); ++c)
      if (theValues[size_t(r) * theCols + c] != theNull) {
        aSum += theValues[size_t(r) * theCols + c];
        ++aCount;
      }
  return aCount == 0 ? 255 : std::min(254, roundHalfUp(theScale * aSum / aCount));
}

class GeoTiffTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override {
    tlrxStartLibraryEnvironment(mDir.path());
    fdfSetSleepFunction([](double) {});
    tlrxWriteFile(fdfGetWorkingFilePath(), "0\n\n");
  }
  std::string file(const std::string &theName) const { return mDir.file(theName); }
  int32_t convert(const std::string &theIn, const std::string &theOut, double theSaturation = 0.0,
                  int32_t theRowRed = 1, int32_t theColRed = 1, double theGain = 1.0, double theExponent = 1.0,
                  bool theInvertRows = false, bool theInvertCols = false, bool theHistogram = false,
                  int32_t theClasses = 1000000, int32_t theSampleRowEnd = -1) {
    return tlrx_raster_to_geotiff(file(theIn).c_str(), file(theOut).c_str(), theSaturation, theRowRed, theColRed,
                                  theGain, theExponent, theInvertRows, theInvertCols, false, theHistogram, 254,
                                  theClasses, nullptr, nullptr, theSampleRowEnd < 0 ? -1 : 0, theSampleRowEnd, -1,
                                  -1, false);
  }
  // A FLOAT raster theName of theValues with theHeader's settings (a plain
  // header when none), converted to theName + ".tif".
  void convertWith(const std::string &theName, CDescription &theHeader, const std::vector<float> &theValues) {
    tlrxWriteGeoTiffRaster(file(theName), theHeader, theValues.data());
    ASSERT_EQ(convert(theName, theName + ".tif"), 0);
  }
  STLRXTiffImage tiff(const std::string &theName) const { return tlrxReadTiff(file(theName)); }
  // GeoTIFF keys of theTiff as libgeotiff reads them (-1: absent).
  void expectKeys(const std::string &theTiff, const std::vector<std::pair<int, int>> &theShorts,
                  const std::vector<std::pair<int, std::string>> &theTexts) const {
    const STLRXGeoKeys aKeys(file(theTiff));
    for (const auto &aKey : theShorts)
      EXPECT_EQ(aKeys.shortValue(aKey.first), aKey.second) << theTiff << " key " << aKey.first;
    for (const auto &aKey : theTexts)
      EXPECT_EQ(aKeys.text(aKey.first), aKey.second) << theTiff << " key " << aKey.first;
  }
  SHeaderStretch stretchOf(const std::string &theTiff) const {
    CDescription aHeader;
    fdfDeclareStandardHeader(aHeader);
    EXPECT_TRUE(aHeader.readFromFile((file(theTiff) + "_hdr").c_str(), false)) << theTiff;
    const auto aDouble = [&](const char *theKey) { return aHeader.getField(theKey).getDouble(); };
    const auto aInteger = [&](const char *theKey) { return aHeader.getField(theKey).getInteger(); };
    return {aDouble("RasterInfo.TiffMinValue"),         aDouble("RasterInfo.TiffMaxValue"),
            aDouble("RasterInfo.TiffScale"),            aDouble("RasterInfo.TiffExponent"),
            aDouble("RasterInfo.NullCellValue"),        aInteger("RasterInfo.TiffRowScale"),
            aInteger("RasterInfo.TiffColScale"),        aInteger("RasterInfo.NrOfLinesPerImage"),
            aInteger("RasterInfo.NrOfPixelsPerLine"),   aHeader.getField("RasterInfo.CellType").getString()};
  }
  // Files whose names hold ".tif" and are not headers: TIFFs and their temporaries.
  std::vector<std::string> tiffFiles() const {
    std::vector<std::string> aFound;
    for (const auto &aEntry : std::filesystem::directory_iterator(mDir.path())) {
      const std::string aName = aEntry.path().filename().string();
      if (aName.find(".tif") != std::string::npos && aName.find(".tif.sml") == std::string::npos)
        aFound.push_back(aName);
    }
    return aFound;
  }
};

} // namespace

TEST(GeoTiffRules, ArgumentsOutsideTheirDomainTakeTheDefaults) {
  const struct {
    const char *mName;
    std::function<double(double)> mRule;
    std::vector<std::pair<double, double>> mCases; // argument, value
  } aRules[] = {
      {"saturation", fdfTiffSaturation, {{0.0, sThird}, {1.0e-39, sThird}, {-0.5, sThird}, {NAN, sThird}, {0.5, 0.5}}},
      {"reduction", [](double theArg) { return fdfTiffReductionFactor(int32_t(theArg)); }, {{0, 1}, {-3, 1}, {4, 4}}},
      {"gain", fdfTiffGain, {{-2.0, 1.0}, {0.0, 1.0}, {2.5, 2.5}}},
      {"exponent", fdfTiffExponent, {{-1.0, 1.0}, {-0.9, 1.0}, {-0.89, -0.89}, {0.0, 1.0}, {0.5, 0.5}}},
      {"levels", [](double theArg) { return fdfTiffLevels(int32_t(theArg)); }, {{0, 254}, {255, 254}, {100, 100}}},
  };
  for (const auto &aRule : aRules)
    for (const auto &aCase : aRule.mCases)
      EXPECT_DOUBLE_EQ(aRule.mRule(aCase.first), aCase.second) << aRule.mName << " of " << aCase.first;
}

TEST(GeoTiffRules, SampleStatisticsMatchTwoPassFormulas) {
  std::mt19937 aRandom(7);
  std::uniform_real_distribution<double> aUniform(-5.0, 1.0e4);
  std::vector<double> aValues(5001);
  CTiffSample aSample;
  double aSum = 0.0, aSqrtSum = 0.0, aSquares = 0.0;
  for (double &aValue : aValues) {
    aValue = 1.0e6 + aUniform(aRandom); // a large offset tests the variance's stability
    aSample.add(aValue);
    aSum += aValue;
    aSqrtSum += std::sqrt(aValue);
  }
  const double aMean = aSum / aValues.size();
  for (double aValue : aValues)
    aSquares += (aValue - aMean) * (aValue - aMean);
  EXPECT_EQ(aSample.count(), 5001);
  EXPECT_NEAR(aSample.mean(), aMean, 1e-9 * aMean);
  EXPECT_NEAR(aSample.stdv(), std::sqrt(aSquares / aValues.size()), 1e-6);
  EXPECT_NEAR(aSample.amplitudeMean(), aSqrtSum / aValues.size(), 1e-9);
  EXPECT_DOUBLE_EQ(aSample.minimum(), *std::min_element(aValues.begin(), aValues.end()));
  EXPECT_DOUBLE_EQ(aSample.maximum(), *std::max_element(aValues.begin(), aValues.end()));
  EXPECT_FALSE(aSample.hasNegative());
  aSample.add(-1.0);
  EXPECT_TRUE(aSample.hasNegative());
  aSample.addParts(3.0, -1.0);
  aSample.addParts(5.0, 2.0);
  EXPECT_DOUBLE_EQ(aSample.realMean(), 4.0);
  EXPECT_DOUBLE_EQ(aSample.imaginaryMean(), 0.5);
}

TEST(GeoTiffRules, ScalesFollowTheDataUnits) {
  const CTiffSample aPositive = sampleOf({4.0, 9.0, 16.0, 25.0}); // mean 13.5, amplitude mean 3.5
  const CTiffSample aSigned = sampleOf({-3.0, 1.0, 8.0}), aZeroMean = sampleOf({-1.0, 1.0}); // means 2 and 0
  STLRXStretchRequest aRequest;
  aRequest.mSaturation = 0.5;
  aRequest.mGain = 2.0;
  aRequest.mExponent = 0.8;
  const STLRXStretch aGeneral = fdfMakeStretch(aRequest, aPositive);
  EXPECT_DOUBLE_EQ(aGeneral.mScale, 254 * 0.5 * 2.0 / std::pow(13.5, 0.8));
  EXPECT_DOUBLE_EQ(aGeneral.mExponent, 0.8);
  EXPECT_DOUBLE_EQ(aGeneral.mOrigin, 0.0);
  EXPECT_EQ(aGeneral.level(13.5), 254); // the mean lands on L s g = 254
  EXPECT_DOUBLE_EQ(fdfMakeStretch(aRequest, aZeroMean).mScale, 0.5 * 254 * 0.5 * 2.0 / 254.0);
  aRequest.mFamily = ETLRXTiffFamily::kIntensity;
  const STLRXStretch aIntensity = fdfMakeStretch(aRequest, aPositive);
  EXPECT_DOUBLE_EQ(aIntensity.mScale, 254 * 0.5 * 2.0 / std::pow(3.5, 0.8));
  EXPECT_DOUBLE_EQ(aIntensity.mExponent, 0.4);
  const STLRXStretch aCentred = fdfMakeStretch(aRequest, aSigned); // negative intensities keep the exponent 1
  EXPECT_DOUBLE_EQ(aCentred.mScale, 0.5 * 254 * 0.5 * 2.0 / 2.0);
  EXPECT_DOUBLE_EQ(aCentred.mExponent, 1.0);
  EXPECT_EQ(aCentred.level(0.0), 127);
  EXPECT_EQ(aCentred.level(2.0), 127 + roundHalfUp(2.0 * aCentred.mScale));
  aRequest.mFamily = ETLRXTiffFamily::kRaw;
  const STLRXStretch aRaw = fdfMakeStretch(aRequest, aPositive);
  EXPECT_DOUBLE_EQ(aRaw.mScale, 2.0);
  EXPECT_DOUBLE_EQ(aRaw.mExponent, 0.8);
}

TEST(GeoTiffRules, InverseMapsEveryLevelBackWithinItsWidth) {
  const CTiffSample aSample = sampleOf({2.0, 40.0, 90.0}), aSigned = sampleOf({-20.0, 5.0, 30.0});
  std::vector<STLRXStretch> aCases;
  STLRXStretchRequest aRequest;
  for (double aExponent : {1.0, 0.5, 0.7, 1.6}) {
    aRequest.mExponent = aExponent;
    aCases.push_back(fdfMakeStretch(aRequest, aSample));
  }
  STLRXStretchRequest aPlain;
  aCases.push_back(fdfMakeStretch(aPlain, aSigned));
  const double aLow = 10.0, aHigh = 60.0;
  aPlain.mForcedMin = &aLow;
  aPlain.mForcedMax = &aHigh;
  aCases.push_back(fdfMakeStretch(aPlain, aSample));
  std::mt19937 aRandom(11);
  for (const STLRXStretch &aStretch : aCases) {
    // A level's width in values, from the documented formula.
    const auto aEdge = [&](double theLevel) {
      return aStretch.mOrigin + std::pow(std::max(theLevel, 0.0) / aStretch.mScale, 1.0 / aStretch.mExponent);
    };
    std::uniform_real_distribution<double> aUniform(aStretch.mOrigin, aStretch.maxValue());
    for (int i = 0; i < 2000; ++i) {
      const double aValue = aUniform(aRandom);
      const int aLevel = aStretch.level(aValue);
      ASSERT_LE(aLevel, 254);
      EXPECT_LE(std::fabs(aStretch.value(aLevel) - aValue), aEdge(aLevel + 0.5) - aEdge(aLevel - 0.5))
          << aValue << " level " << aLevel;
    }
  }
  // Phase: one level is 2 pi / 255 wide; compare on the circle.
  STLRXStretchRequest aPhase;
  aPhase.mFamily = ETLRXTiffFamily::kPhase;
  const STLRXStretch aWrap = fdfMakeStretch(aPhase, sampleOf({0.0}));
  for (double aValue = -3 * sPi; aValue < 3 * sPi; aValue += 0.0137)
    EXPECT_LE(std::fabs(std::remainder(aWrap.value(aWrap.level(aValue)) - aValue, 2 * sPi)), sPi / 255 + 1e-12)
        << aValue;
  EXPECT_EQ(aWrap.level(-sPi), 0);
  EXPECT_EQ(aWrap.level(0.0), 127);
  EXPECT_EQ(aWrap.level(sPi - 1e-9), 254);
}

TEST(GeoTiffRules, LevelsStayInRangeNullAndUnknownClassesGet255AndLimitsPinTheWindow) {
  const CTiffSample aSample = sampleOf({10.0});
  STLRXStretchRequest aRequest;
  aRequest.mExponent = 0.6;
  const std::vector<double> aValues = {-1e300, -5.0, 0.0, 1e-300, 10.0, 1e6, 1e300};
  const std::vector<uint8_t> aValid = {1, 1, 1, 0, 1, 1, 1};
  std::vector<uint8_t> aOut(aValues.size());
  fdfStretchLine(fdfMakeStretch(aRequest, aSample), aValues.data(), aValid.data(), 7, aOut.data());
  EXPECT_EQ(aOut[0], 0);
  EXPECT_EQ(aOut[2], 0);
  EXPECT_EQ(aOut[3], 255);
  EXPECT_EQ(aOut[6], 254);
  for (size_t i = 0; i < aOut.size(); ++i)
    EXPECT_LE(aOut[i], i == 3 ? 255 : 254) << i;
  aRequest.mFamily = ETLRXTiffFamily::kClass;
  const STLRXStretch aClasses = fdfMakeStretch(aRequest, aSample);
  const std::vector<double> aNumbers = {0.0, 7.0, 254.0, 255.0, 300.0, -3.0, std::nan("")};
  const std::vector<uint8_t> aAll(aNumbers.size(), 1);
  std::vector<uint8_t> aLevels(aNumbers.size());
  fdfStretchLine(aClasses, aNumbers.data(), aAll.data(), 7, aLevels.data());
  EXPECT_EQ(aLevels, (std::vector<uint8_t>{0, 7, 254, 255, 255, 255, 255}));
  EXPECT_DOUBLE_EQ(aClasses.value(7), 7.0);
  // Forced limits pin the stretch window; a maximum below the minimum is ignored.
  const CTiffSample aSmall = sampleOf({1.0, 2.0, 3.0});
  const double aLow = 100.0, aHigh = 300.0, aBad = 50.0;
  STLRXStretchRequest aForced, aPlain;
  aForced.mForcedMin = &aLow;
  aForced.mForcedMax = &aHigh;
  const STLRXStretch aBoth = fdfMakeStretch(aForced, aSmall);
  EXPECT_EQ(aBoth.level(100.0), 0);
  EXPECT_EQ(aBoth.level(300.0), 254);
  EXPECT_EQ(aBoth.level(200.0), 127);
  EXPECT_DOUBLE_EQ(aBoth.maxValue(), 300.0);
  aForced.mForcedMax = &aBad;
  const STLRXStretch aIgnored = fdfMakeStretch(aForced, aSmall);
  EXPECT_DOUBLE_EQ(aIgnored.mScale, fdfMakeStretch(aPlain, aSmall).mScale);
  EXPECT_DOUBLE_EQ(aIgnored.mOrigin, 0.0);
}

TEST(GeoTiffRules, HistogramTableEqualisesTheSample) {
  EXPECT_FALSE(CTiffHistogramLut::validClassCount(1));
  EXPECT_TRUE(CTiffHistogramLut::validClassCount(2));
  EXPECT_FALSE(CTiffHistogramLut::validClassCount(CTLRX_TIFF_MAX_HISTOGRAM_CLASSES + 1));
  // Skewed sample: values v = u^3 of uniform u; equalised levels follow u,
  // up to the share of the sample that falls into the value's class.
  const int aClasses = 100000, aCount = 20000;
  const auto aClass = [&](double theValue) { return std::min(aClasses - 1, int(theValue / 1000.0 * aClasses)); };
  CTiffHistogramLut aLut(0.0, 1000.0, aClasses, 254);
  std::vector<double> aValues;
  std::vector<int> aClassCount(aClasses, 0);
  for (int i = 0; i < aCount; ++i) {
    const double aU = (i + 0.5) / aCount;
    aValues.push_back(1000.0 * aU * aU * aU);
    aLut.add(aValues.back());
    ++aClassCount[aClass(aValues.back())];
  }
  ASSERT_TRUE(aLut.equalise());
  int aPrevious = 0;
  for (size_t i = 0; i < aValues.size(); i += 97) {
    const int aLevel = aLut.level(aValues[i]);
    const double aShare = aClassCount[aClass(aValues[i])] / double(aCount);
    EXPECT_NEAR(aLevel, 254.0 * (i + 0.5) / aCount, 254.0 * aShare / 2 + 1.0) << aValues[i];
    EXPECT_GE(aLevel, aPrevious);
    aPrevious = aLevel;
    EXPECT_EQ(aLut.level(aLut.levelValue(aLevel)), aLevel); // the level's value lies among its values
  }
  CTiffHistogramLut aConstant(5.0, 5.0, 10, 254); // a single value: mid-range
  aConstant.add(5.0);
  ASSERT_TRUE(aConstant.equalise());
  EXPECT_EQ(aConstant.level(5.0), 127);
}

TEST(GeoTiffRules, BlocksAverageTheirValidCellsOrKeepTheirCentre) {
  // Two output cells of 3 columns, two rows per block.
  const std::vector<double> aRow0 = {1, 2, 3, 10, 20, 30}, aRow1 = {5, 6, 7, 40, 50, 60};
  const std::vector<uint8_t> aValid0 = {1, 0, 1, 0, 0, 0}, aValid1 = {1, 1, 1, 0, 0, 0};
  CTiffBlockReducer aAverage(ETLRXBlockRule::kAverage, 2, 3), aCentre(ETLRXBlockRule::kCentre, 2, 3);
  aAverage.startBlock();
  aAverage.addRow(aRow0.data(), aValid0.data());
  aAverage.addRow(aRow1.data(), aValid1.data());
  double aOut[2];
  uint8_t aValid[2];
  aAverage.finishBlock(aOut, aValid);
  EXPECT_DOUBLE_EQ(aOut[0], (1 + 3 + 5 + 6 + 7) / 5.0);
  EXPECT_EQ(aValid[0], 1);
  EXPECT_EQ(aValid[1], 0);
  aCentre.startBlock();
  aCentre.addRow(aRow1.data(), aValid0.data());
  aCentre.finishBlock(aOut, aValid);
  EXPECT_DOUBLE_EQ(aOut[0], 6.0);
  EXPECT_EQ(aValid[0], 0); // the centre cell of row 0's mask is null
}

TEST_F(GeoTiffTest, AmplitudeRasterFollowsTheDirectStretchAndReadsBack) {
  const int aRows = 30, aCols = 24;
  const std::vector<float> aValues = rampValues(aRows, aCols);
  tlrxWriteFloatRaster(file("amp"), aRows, aCols, aValues, "AMPLITUDE");
  ASSERT_EQ(convert("amp", "amp.tif"), 0);
  const double aScale = 254.0 * sThird / centralThirdMean(aValues, aRows, aCols);
  const STLRXTiffImage aTiff = tiff("amp.tif");
  // Width, length, rows per strip, bits per sample, photometric; no palette.
  ASSERT_EQ((std::vector<uint32_t>{aTiff.mWidth, aTiff.mLength, aTiff.mRowsPerStrip, aTiff.mBitsPerSample,
                                   aTiff.mPhotometric}),
            (std::vector<uint32_t>{uint32_t(aCols), uint32_t(aRows), 20, 8, PHOTOMETRIC_MINISBLACK}));
  EXPECT_TRUE(aTiff.mRed.empty());
  EXPECT_EQ(aTiff.mSoftware, fdfGetBanner());
  EXPECT_EQ(aTiff.mDocumentName, file("amp"));
  const SHeaderStretch aHeader = stretchOf("amp.tif");
  EXPECT_TRUE(tlrxFileExists(file("amp.tif.sml")));
  EXPECT_EQ(aHeader.mCellType, "UNSIGNED_BYTE");
  EXPECT_NEAR(aHeader.mScale, aScale, 1e-12 * aScale);
  EXPECT_NEAR(aHeader.mMax, 254.0 / aScale, 1e-9);
  // Null, exponent, minimum, row and column scales.
  EXPECT_EQ((std::vector<double>{aHeader.mNull, aHeader.mExponent, aHeader.mMin, double(aHeader.mRowScale),
                                 double(aHeader.mColScale)}),
            (std::vector<double>{255, 1, 0, 1, 1}));
  expectLevels(aTiff, aValues, aScale, false);
  for (size_t i = 0; i < aValues.size(); ++i) // a reader gets the value back within one level's width
    if (aTiff.mPixels[i] < 254)
      EXPECT_LE(std::fabs(aHeader.value(aTiff.mPixels[i]) - aValues[i]), 1.0 / aHeader.mScale) << i;
  EXPECT_EQ(tiffFiles(), std::vector<std::string>{"amp.tif"});
  // A reduction beyond the image keeps one pixel on that side.
  ASSERT_EQ(convert("amp", "huge.tif", 0.0, 100, 1), 0);
  EXPECT_EQ(tiff("huge.tif").mLength, 1u);
}

TEST_F(GeoTiffTest, SignedIntensitiesNullCellsAndComplexSlc) {
  // Signed data: 0 on level 127, the exponent not applied.
  const int aRows = 12, aCols = 12;
  std::vector<float> aSigned(aRows * aCols), aPower = rampValues(aRows, aCols), aModulus(9 * 9);
  for (size_t i = 0; i < aSigned.size(); ++i)
    aSigned[i] = static_cast<float>((i / aCols * 5 + i % aCols * 3) % 21) - 10.0f;
  aSigned[0] = 0.0f;
  const double aNoData = -9999.0; // 0 would be the null value without one
  tlrxWriteFloatRaster(file("db"), aRows, aCols, aSigned, "RATIO", &aNoData);
  ASSERT_EQ(convert("db", "db.tif", 0.0, 1, 1, 1.0, 2.0), 0);
  EXPECT_EQ(tiff("db.tif").at(0, 0), 127);
  expectLevels(tiff("db.tif"), aSigned, 0.5 * 254 * sThird / std::fabs(centralThirdMean(aSigned, aRows, aCols)), true);
  EXPECT_DOUBLE_EQ(stretchOf("db.tif").mExponent, 1.0);
  // Intensities are stretched as amplitudes; null cells get level 255.
  const double aNull = -1.0;
  aPower[5] = aPower[size_t(6) * aCols + 6] = -1.0f; // the second inside the sample: skipped
  tlrxWriteFloatRaster(file("pow"), aRows, aCols, aPower, "POWER", &aNull);
  ASSERT_EQ(convert("pow", "pow.tif", 0.5), 0);
  std::vector<double> aAmplitude;
  for (float aValue : aPower)
    aAmplitude.push_back(aValue < 0 ? NAN : std::sqrt(double(aValue)));
  const double aAmpScale = 254 * 0.5 / centralThirdMean(aAmplitude, aRows, aCols);
  const SHeaderStretch aHeader = stretchOf("pow.tif");
  EXPECT_DOUBLE_EQ(aHeader.mExponent, 0.5);
  EXPECT_NEAR(aHeader.mScale, aAmpScale, 1e-12 * aAmpScale);
  expectLevels(tiff("pow.tif"), aAmplitude, aAmpScale, false);
  // Complex SLC cells are shown by their modulus.
  std::vector<int16_t> aCells(aModulus.size() * 2);
  for (size_t i = 0; i < aModulus.size(); ++i) {
    aCells[2 * i] = int16_t(3 * (i % 7) + 1);
    aCells[2 * i + 1] = int16_t(-4 * (i % 5));
    aModulus[i] = static_cast<float>(std::hypot(aCells[2 * i], aCells[2 * i + 1]));
  }
  CDescription aSlc;
  tlrxGeoTiffHeader(aSlc, 9, 9, "SHORT_COMPLEX", "SLC");
  tlrxWriteGeoTiffRaster(file("slc"), aSlc, aCells.data());
  ASSERT_EQ(convert("slc", "slc.tif"), 0);
  expectLevels(tiff("slc.tif"), aModulus, 254 * sThird / centralThirdMean(aModulus, 9, 9), false);
}

TEST_F(GeoTiffTest, ReductionAveragesBlocksAndInversionMirrors) {
  const int aRows = 31, aCols = 25; // remainders of one row and one column are dropped
  std::vector<float> aValues = rampValues(aRows, aCols);
  const double aNull = 0.0;
  for (int c = 0; c < 3; ++c)
    aValues[size_t(2) * aCols + c] = aValues[size_t(3) * aCols + c] = 0.0f; // block (1, 0) all null
  aValues[1] = 0.0f;
  tlrxWriteFloatRaster(file("red"), aRows, aCols, aValues, "AMPLITUDE", &aNull);
  ASSERT_EQ(convert("red", "red.tif", 0.0, 2, 3), 0);
  ASSERT_EQ(convert("red", "flip.tif", 0.0, 2, 3, 1.0, 1.0, true, true), 0);
  const STLRXTiffImage aTiff = tiff("red.tif"), aFlip = tiff("flip.tif");
  const SHeaderStretch aHeader = stretchOf("red.tif");
  ASSERT_EQ((std::vector<uint32_t>{aTiff.mLength, aTiff.mWidth}), (std::vector<uint32_t>{15, 8}));
  EXPECT_EQ((std::vector<int>{aHeader.mLines, aHeader.mPixels, aHeader.mRowScale, aHeader.mColScale}),
            (std::vector<int>{15, 8, 2, 3}));
  for (int i = 0; i < 15; ++i)
    for (int j = 0; j < 8; ++j) {
      const int aExpected = blockLevel(aValues, aCols, 2, 3, i, j, aHeader.mScale, 0.0f);
      ASSERT_EQ(aTiff.at(i, j), aExpected) << i << "," << j;
      ASSERT_EQ(aFlip.at(14 - i, 7 - j), aExpected);
    }
  EXPECT_EQ(aTiff.at(1, 0), 255);
  // The header's inversion flag mirrors too.
  CDescription aFlagged;
  tlrxGeoTiffHeader(aFlagged, aRows, aCols, "FLOAT", "AMPLITUDE", &aNull);
  aFlagged.getField("RasterInfo.TiffRowsInvert") = "OK";
  tlrxWriteGeoTiffRaster(file("hf"), aFlagged, aValues.data());
  ASSERT_EQ(convert("hf", "hf.tif", 0.0, 2, 3), 0);
  const STLRXTiffImage aRowsFlipped = tiff("hf.tif");
  for (int i = 0; i < 15; ++i)
    for (int j = 0; j < 8; ++j)
      ASSERT_EQ(aRowsFlipped.at(i, j), aTiff.at(14 - i, j)) << i << "," << j;
}

TEST_F(GeoTiffTest, UtmSouthGeographicOtherAndNoState) {
  const std::vector<float> aValues = rampValues(20, 30);
  CDescription aHeader;
  tlrxGeoTiffHeader(aHeader, 20, 30, "FLOAT", "AMPLITUDE");
  tlrxGeoTiffUtm(aHeader, 32, "SOUTH", 500000.0, 7000000.0, 10.0, -15.0);
  tlrxWriteGeoTiffRaster(file("utm"), aHeader, aValues.data());
  ASSERT_EQ(convert("utm", "utm.tif", 0.0, 2, 4, 1.0, 1.0, false, true), 0); // columns mirrored
  expectKeys("utm.tif", {{CTLRX_GT_MODEL_TYPE, 1}, {CTLRX_GT_RASTER_TYPE, 1}, {CTLRX_PROJECTED_CS_TYPE, 32732},
                         {CTLRX_PROJ_LINEAR_UNITS, 9001}},
             {{CTLRX_GT_CITATION, "UTM Zone 32S WGS84"}, {CTLRX_PCS_CITATION, "UTM Zone 32S  with WGS84"}});
  EXPECT_DOUBLE_EQ(STLRXGeoKeys(file("utm.tif")).doubleValue(CTLRX_PROJ_LINEAR_UNIT_SIZE), 1.0);
  // 30 / 4 = 7 columns of 40 m, mirrored: the tie point is the east edge.
  const STLRXTiffImage aUtm = tiff("utm.tif");
  EXPECT_EQ(aUtm.mTiePoint, (std::vector<double>{0, 0, 0, 500000.0 + 7 * 40.0, 7000000.0, 0}));
  EXPECT_EQ(aUtm.mPixelScale, (std::vector<double>{-40.0, 30.0, 0}));
  EXPECT_EQ(stretchOf("utm.tif").mPixels, 7);
  CDescription aGeo;
  tlrxGeoTiffHeader(aGeo, 20, 30, "FLOAT", "AMPLITUDE");
  tlrxGeoTiffGeographic(aGeo, 11.5, 45.25, 0.001, -0.002);
  tlrxWriteGeoTiffRaster(file("geo"), aGeo, aValues.data());
  ASSERT_EQ(convert("geo", "geo.tif", 0.0, 1, 1, 1.0, 1.0, true, false), 0);
  expectKeys("geo.tif", {{CTLRX_GT_MODEL_TYPE, 2}, {CTLRX_GEOGRAPHIC_TYPE, 4326}, {CTLRX_GEOG_GEODETIC_DATUM, 6326},
                         {CTLRX_GEOG_ELLIPSOID, 7030}, {CTLRX_GEOG_PRIME_MERIDIAN, 8901}, {CTLRX_GEOG_ANGULAR_UNITS, 9102}},
             {{CTLRX_GT_CITATION, "Geographic Model WGS 84"}, {CTLRX_GEOG_CITATION, "WGS 84 Ellipsoid Used"}});
  EXPECT_NEAR(STLRXGeoKeys(file("geo.tif")).doubleValue(CTLRX_GEOG_ANGULAR_UNIT_SIZE), sPi / 180.0, 1e-15);
  const STLRXTiffImage aGeoTiff = tiff("geo.tif");
  ASSERT_EQ(aGeoTiff.mTiePoint.size(), 6u);
  EXPECT_DOUBLE_EQ(aGeoTiff.mTiePoint[3], 11.5);
  EXPECT_DOUBLE_EQ(aGeoTiff.mTiePoint[4], 45.25 - 20 * 0.002); // mirrored rows start at the south edge
  EXPECT_DOUBLE_EQ(aGeoTiff.mPixelScale[1], -0.002);
  CDescription aOther;
  tlrxGeoTiffHeader(aOther, 20, 30, "FLOAT", "AMPLITUDE");
  aOther.getField("CartographicSystem.State") = "LAMBERT72";
  aOther.getField("CartographicSystem.Hemisphere") = "NORTH";
  aOther.getField("CartographicSystem.Zone") = 31;
  convertWith("other", aOther, aValues);
  expectKeys("other.tif", {{CTLRX_PROJ_LINEAR_UNITS, 9001}, {CTLRX_PROJECTED_CS_TYPE, -1}},
             {{CTLRX_GT_CITATION, "| State =LAMBERT72| Hemisphere =NORTH| Zone =31"}});
  EXPECT_TRUE(tiff("other.tif").mTiePoint.empty()); // no registration coordinates
  CDescription aRadar;
  tlrxGeoTiffHeader(aRadar, 20, 30, "FLOAT", "AMPLITUDE");
  convertWith("radar", aRadar, aValues);
  expectKeys("radar.tif", {{CTLRX_GT_MODEL_TYPE, -1}}, {{CTLRX_GT_CITATION, "No Geocoded Image"}});
  EXPECT_TRUE(tiff("radar.tif").mTiePoint.empty());
}

TEST_F(GeoTiffTest, InterferogramPhaseThroughTheHeaderPaletteOrAColourWheel) {
  const int aRows = 8, aCols = 10;
  std::vector<float> aCells(size_t(aRows) * aCols * 2);
  std::vector<double> aPhase(size_t(aRows) * aCols);
  for (size_t i = 0; i < aPhase.size(); ++i) {
    aPhase[i] = -sPi + 0.3 + 0.09 * i; // past pi: wraps round
    const double aMagnitude = 0.2 + 0.01 * (i % 50);
    aCells[2 * i] = static_cast<float>(aMagnitude * std::cos(aPhase[i]));
    aCells[2 * i + 1] = static_cast<float>(aMagnitude * std::sin(aPhase[i]));
  }
  CDescription aHeader;
  tlrxGeoTiffHeader(aHeader, aRows, aCols, "FLOAT_COMPLEX", "INTERFEROGRAMME");
  const char *aLuts[3] = {"RasterInfo.TiffLUTRed", "RasterInfo.TiffLUTGreen", "RasterInfo.TiffLUTBlue"};
  for (int c = 0; c < 3; ++c) {
    CDescriptionField &aLut = aHeader.getField(aLuts[c]);
    aLut.setNumberOfElements(256);
    for (int k = 0; k < 256; ++k)
      aLut.setInteger(k, c == 0 ? k : c == 1 ? 255 - k : k / 2);
  }
  tlrxWriteGeoTiffRaster(file("ifg"), aHeader, aCells.data());
  ASSERT_EQ(convert("ifg", "ifg.tif"), 0);
  const STLRXTiffImage aTiff = tiff("ifg.tif");
  EXPECT_EQ(aTiff.mPhotometric, PHOTOMETRIC_PALETTE);
  ASSERT_EQ(aTiff.mRed.size(), 256u);
  EXPECT_EQ((std::vector<int>{aTiff.mRed[200], aTiff.mGreen[200], aTiff.mBlue[255]}),
            (std::vector<int>{200 * 257, 55 * 257, 127 * 257}));
  for (size_t i = 0; i < aPhase.size(); ++i) {
    const double aTurn = (aPhase[i] + sPi) / (2 * sPi);
    const int aApart = std::abs(aTiff.mPixels[i] - int(std::floor((aTurn - std::floor(aTurn)) * 255.0)) % 255);
    ASSERT_LE(std::min(aApart, 255 - aApart), 1) << i; // float cells blur exact edges; levels wrap
  }
  const SHeaderStretch aStretch = stretchOf("ifg.tif");
  EXPECT_NEAR(aStretch.mMin, -sPi + sPi / 255, 1e-12);
  EXPECT_NEAR(aStretch.mScale, 255 / (2 * sPi), 1e-12);
  CDescription aBare;
  tlrxGeoTiffHeader(aBare, aRows, aCols, "FLOAT_COMPLEX", "FLATTENED INTERFEROGRAMME");
  tlrxWriteGeoTiffRaster(file("flat"), aBare, aCells.data());
  ASSERT_EQ(convert("flat", "flat.tif"), 0);
  const STLRXTiffImage aWheel = tiff("flat.tif");
  ASSERT_EQ(aWheel.mRed.size(), 256u);
  // Level 0 red; the null level black.
  EXPECT_EQ((std::vector<int>{aWheel.mRed[0], aWheel.mGreen[0], aWheel.mRed[255] + aWheel.mGreen[255] + aWheel.mBlue[255]}),
            (std::vector<int>{65535, 0, 0}));
}

TEST_F(GeoTiffTest, ClassificationKeepsEveryClassNumberAsItsLevel) {
  const std::vector<float> aClasses = {0, 1, 2, 3, 4, 5, 0, 254, 300, -9, 7, 2, 0, 1, 1, 3};
  const double aNull = -9.0;
  tlrxWriteFloatRaster(file("cls"), 4, 4, aClasses, "CLASSIFICATION", &aNull);
  ASSERT_EQ(convert("cls", "cls.tif"), 0);
  std::vector<float> aExpected = aClasses;
  for (float &aClass : aExpected)
    aClass = aClass < 0 || aClass > 254 ? NAN : aClass;
  expectLevels(tiff("cls.tif"), aExpected, 1.0, false);
  const SHeaderStretch aHeader = stretchOf("cls.tif");
  EXPECT_DOUBLE_EQ(aHeader.value(7), 7.0);
  EXPECT_DOUBLE_EQ(aHeader.mMax, 254.0);
}

TEST_F(GeoTiffTest, HistogramStretchRecordsTheValueOfEveryLevel) {
  const int aRows = 120, aCols = 120;
  std::vector<float> aValues(size_t(aRows) * aCols);
  for (size_t i = 0; i < aValues.size(); ++i)
    aValues[i] = static_cast<float>(std::pow((i * 37 % 14400) / 14400.0, 3) * 1000.0);
  tlrxWriteFloatRaster(file("h"), aRows, aCols, aValues, "AMPLITUDE");
  ASSERT_EQ(convert("h", "h.tif", 0.0, 1, 1, 1.0, 1.0, false, false, true), 0);
  // Equalised: the median pixel sits mid-range (a linear stretch of these
  // cubes would put it near level 32).
  std::vector<uint8_t> aSorted = tiff("h.tif").mPixels;
  std::nth_element(aSorted.begin(), aSorted.begin() + aSorted.size() / 2, aSorted.end());
  EXPECT_NEAR(aSorted[aSorted.size() / 2], 127, 15);
  CDescription aHeader;
  fdfDeclareStandardHeader(aHeader);
  ASSERT_TRUE(aHeader.readFromFile(file("h.tif_hdr").c_str(), false));
  const CDescriptionField &aInfo = aHeader.getField("RasterInfo.OtherInfo");
  std::string aLevels;
  for (int32_t r = 0; r < aInfo.getRowNbr(); ++r)
    if (std::string(aInfo.getString(r, 0)) == "TiffLevelValues")
      aLevels = aInfo.getString(r, 1);
  std::istringstream aStream(aLevels);
  const std::vector<double> aTable{std::istream_iterator<double>(aStream), std::istream_iterator<double>()};
  ASSERT_EQ(aTable.size(), 255u);
  EXPECT_TRUE(std::is_sorted(aTable.begin(), aTable.end()));
  EXPECT_EQ(tlrxRaisedCode([&] { convert("h", "bad.tif", 0.0, 1, 1, 1.0, 1.0, false, false, true, 1); }),
            CTLRX_ERR_TIFF_HISTOGRAM);
  EXPECT_EQ(tiffFiles(), std::vector<std::string>{"h.tif"});
}

TEST_F(GeoTiffTest, BadInputRaisesItsCodeAndLeavesNoTiff) {
  // A central third of nulls fails even with valid values elsewhere; a
  // sample window given by the caller that holds valid values succeeds.
  std::vector<float> aValues = rampValues(30, 30);
  for (int r = 10; r <= 20; ++r)
    for (int c = 10; c <= 20; ++c)
      aValues[size_t(r) * 30 + c] = std::nanf("");
  tlrxWriteFloatRaster(file("holes"), 30, 30, aValues, "AMPLITUDE");
  tlrxWriteFloatRaster(file("nodata"), 9, 9, aValues, "AMPLITUDE");
  std::remove(file("nodata").c_str());
  tlrxWriteFloatRaster(file("ok"), 9, 9, aValues, "AMPLITUDE");
  ASSERT_EQ(mkdir(file("d.tif.sml").c_str(), 0755), 0); // the TIFF's header cannot be created
  const struct {
    const char *mIn, *mOut;
    int32_t mCode;
    std::string mMessage; // the whole message, or its start when a library's reason follows
  } aCases[] = {
      {"holes", "holes.tif", CTLRX_ERR_TIFF_EMPTY_SAMPLE, "Error: 0 non null points in the input file : " + file("holes")},
      {"absent", "a.tif", CTLRX_ERR_TIFF_HEADER_MISSING, "Error: missing parameter file " + file("absent_hdr")},
      {"nodata", "b.tif", CTLRX_ERR_TIFF_RASTER_OPEN, "Wrong CRasterFile Status " + file("nodata")},
      {"ok", "missing_dir/c.tif", CTLRX_ERR_TIFF_CREATE, "failed in GTIFNew " + file("missing_dir/c.tif")},
      {"ok", "d.tif", CTLRX_ERR_TIFF_HEADER_WRITE, "Error while writing parameter file " + file("d.tif.sml")},
  };
  for (const auto &aCase : aCases) {
    std::string aMessage;
    EXPECT_EQ(tlrxRaisedCode([&] { convert(aCase.mIn, aCase.mOut); }, &aMessage), aCase.mCode) << aCase.mIn;
    EXPECT_EQ(aCase.mCode == CTLRX_ERR_TIFF_CREATE ? aMessage.substr(0, aCase.mMessage.size()) : aMessage,
              aCase.mMessage);
  }
  EXPECT_TRUE(tiffFiles().empty());
  EXPECT_FALSE(tlrxFileExists(file("holes.tif.sml")));
  ASSERT_EQ(convert("holes", "holes.tif", 0.0, 1, 1, 1.0, 1.0, false, false, false, 1000000, 5), 0);
}

TEST(GeoTiffTemporaries, OwnerIsReadOnlyFromATemporaryOfThatTiff) {
  const std::pair<const char *, int> aCases[] = {
      {"q.tif.tlrxtmp_4242.aB3xYz", 4242}, {"q.tif.tlrxtmp_1.000000", 1},        {"q.tif.tlrxtmp_4242.aB3xY", 0},
      {"q.tif.tlrxtmp_4242.aB3xYz7", 0},   {"q.tif.tlrxtmp_4242.aB-xYz", 0},     {"q.tif.tlrxtmp_.aB3xYz", 0},
      {"q.tif.tlrxtmp_0.aB3xYz", 0},       {"q.tif.tlrxtmp_42a.aB3xYz", 0},      {"q.tif.tlrxtmp_99999999999.aB3xYz", 0},
      {"q.tif.tlrxtmp_4242.aB3xYz.sml", 0}, {"r.tif.tlrxtmp_4242.aB3xYz", 0},    {"xq.tif.tlrxtmp_4242.aB3xYz", 0},
      {"q.tif.aB3xYz", 0},                 {"q.tif", 0},
  };
  for (const auto &aCase : aCases)
    EXPECT_EQ(fdfTemporaryOwner("q.tif", CTLRX_TIFF_TEMPORARY_TAG, 6, aCase.first), aCase.second) << aCase.first;
  EXPECT_EQ(fdfTemporaryOwner("", CTLRX_TIFF_TEMPORARY_TAG, 6, ".tlrxtmp_4242.aB3xYz"), 0);
  // Raster parts end at the pid.
  EXPECT_EQ(fdfTemporaryOwner("r", ".part-", 0, "r.part-77"), 77);
  EXPECT_EQ(fdfTemporaryOwner("r", ".part-", 0, "r.part-77.sml"), 0);
}

// A run killed while it wrote q.tif leaves its temporary; the next
// conversion to q.tif removes it, and nothing that is not one.
TEST_F(GeoTiffTest, StaleTemporariesOfTheTiffAreRemovedAndNothingElse) {
  const pid_t aChild = fork();
  if (aChild == 0)
    _exit(0);
  ASSERT_GT(aChild, 0);
  ASSERT_EQ(waitpid(aChild, nullptr, 0), aChild);
  const std::string aDead = std::to_string(aChild);
  const std::string aStale = "q.tif.tlrxtmp_" + aDead + ".abc123";
  const std::vector<std::string> aKept = {
      "q.tif.tlrxtmp_1.abc123",                                // owner alive
      "q.tif.tlrxtmp_" + std::to_string(getpid()) + ".abc124", // this process's own
      "r.tif.tlrxtmp_" + aDead + ".abc123",                    // another TIFF's
      "q.tif.tlrxtmp_" + aDead + ".abc12",                     // not such a name
      "q.tif.abc123",                                          // could be anyone's
  };
  tlrxWriteFloatRaster(file("ok"), 9, 9, rampValues(9, 9), "AMPLITUDE");
  tlrxWriteFile(file(aStale), "stale");
  for (const std::string &aName : aKept)
    tlrxWriteFile(file(aName), "keep");
  tlrxWriteFile(file("target"), "target");
  const std::string aLink = "q.tif.tlrxtmp_" + aDead + ".lnk123", aFolder = "q.tif.tlrxtmp_" + aDead + ".dir123";
  ASSERT_EQ(symlink(file("target").c_str(), file(aLink).c_str()), 0);
  ASSERT_EQ(mkdir(file(aFolder).c_str(), 0755), 0);
  ASSERT_EQ(convert("ok", "q.tif"), 0);
  EXPECT_FALSE(tlrxFileExists(file(aStale)));
  for (const std::string &aName : aKept)
    EXPECT_EQ(tlrxReadFile(file(aName)), "keep") << aName;
  EXPECT_TRUE(std::filesystem::is_symlink(file(aLink)));
  EXPECT_EQ(tlrxReadFile(file("target")), "target");
  EXPECT_TRUE(std::filesystem::is_directory(file(aFolder)));
  EXPECT_TRUE(tlrxFileExists(file("q.tif")));
  // A temporary names its TIFF and its writer, in the TIFF's folder.
  CGeoTiffFile aFile(file("t.tif"), 100);
  const std::filesystem::path aTemporary(aFile.temporaryName());
  EXPECT_EQ(fdfTemporaryOwner("t.tif", CTLRX_TIFF_TEMPORARY_TAG, 6, aTemporary.filename().string()), fdfProcessId());
  EXPECT_EQ(aTemporary.parent_path(), std::filesystem::path(file("t.tif")).parent_path());
}

TEST_F(GeoTiffTest, ProgressReachesTheWritingPassAndInterruptionStops) {
  tlrxWriteFloatRaster(file("p"), 40, 8, rampValues(40, 8), "AMPLITUDE");
  ASSERT_EQ(convert("p", "p.tif"), 0);
  const std::vector<std::string> aLines = tlrxReadLines(fdfGetWorkingFilePath());
  ASSERT_FALSE(aLines.empty());
  EXPECT_EQ(aLines[0], std::to_string(30 + 70 * 39 / 40));
  tlrxWriteFile(fdfGetWorkingFilePath(), "101\n\n");
  EXPECT_EQ(tlrxRaisedCode([&] { convert("p", "stopped.tif"); }), CTLRX_ERR_INTERRUPTED);
  EXPECT_EQ(tiffFiles(), std::vector<std::string>{"p.tif"});
}

TEST_F(GeoTiffTest, ArgumentVectorEntry) {
  const std::vector<float> aValues = rampValues(12, 20);
  tlrxWriteFloatRaster(file("v"), 12, 20, aValues, "AMPLITUDE");
  const auto aRun = [&](std::vector<std::string> theArgs) {
    theArgs.insert(theArgs.begin(), {"geotiff", file("v")});
    std::vector<char *> aArgv;
    for (std::string &aArg : theArgs)
      aArgv.push_back(aArg.data());
    return make_tiff(int(aArgv.size()), aArgv.data());
  };
  EXPECT_EQ(tlrxRaisedCode([&] { aRun({}); }), CTLRX_ERR_TIFF_ARGUMENTS);
  EXPECT_EQ(fdfGetPEC(CTLRX_ERR_TIFF_ARGUMENTS), 2);
  // Two names only: every default.
  ASSERT_EQ(aRun({file("v.tif")}), 0);
  EXPECT_NEAR(stretchOf("v.tif").mScale, 254 * sThird / centralThirdMean(aValues, 12, 20), 1e-9);
  EXPECT_EQ(tiff("v.tif").mWidth, 20u);
  // Number arguments are read whole: each of these is refused, naming it.
  const std::pair<std::vector<std::string>, const char *> aBadArguments[] = {
      {{"0.3x"}, "geotiff argument 3 is not a finite number: [0.3x]"},
      {{"inf"}, "geotiff argument 3 is not a finite number: [inf]"},
      {{"0", "2x"}, "geotiff argument 4 is not an integer: [2x]"},
      {{"0", "1", "4294967299"}, "geotiff argument 5 is not an integer: [4294967299]"},
      {{"0", "1", "1", "not a number"}, "geotiff argument 6 is not a finite number: [not a number]"},
      {{"0", "1", "1", "1", "1e999"}, "geotiff argument 7 is not a finite number: [1e999]"},
  };
  for (const auto &aBad : aBadArguments) {
    std::vector<std::string> aArgs = {file("bad.tif")};
    aArgs.insert(aArgs.end(), aBad.first.begin(), aBad.first.end());
    std::string aMessage;
    EXPECT_EQ(tlrxRaisedCode([&] { aRun(aArgs); }, &aMessage), CTLRX_ERR_TIFF_ARGUMENTS) << aBad.second;
    EXPECT_EQ(aMessage, aBad.second);
    EXPECT_FALSE(tlrxFileExists(file("bad.tif")));
  }
  // Column reduction before row reduction; columns mirrored ("OK"), rows not
  // ("ok"): the same TIFF as the direct call.
  ASSERT_EQ(aRun({file("w.tif"), "0", "2", "3", " 1 ", "-1", "ignored", "OK", "ok"}), 0);
  ASSERT_EQ(convert("v", "ref.tif", 0.0, 3, 2, 1.0, 1.0, false, true), 0);
  const SHeaderStretch aHeader = stretchOf("w.tif");
  EXPECT_EQ((std::vector<double>{double(aHeader.mColScale), double(aHeader.mRowScale), aHeader.mExponent}),
            (std::vector<double>{2, 3, 1}));
  EXPECT_DOUBLE_EQ(aHeader.mScale, stretchOf("ref.tif").mScale);
  const STLRXTiffImage aTiff = tiff("w.tif");
  ASSERT_EQ((std::vector<uint32_t>{aTiff.mWidth, aTiff.mLength}), (std::vector<uint32_t>{10, 4}));
  EXPECT_EQ(aTiff.mPixels, tiff("ref.tif").mPixels);
  EXPECT_EQ(aTiff.at(0, 9), blockLevel(aValues, 20, 3, 2, 0, 0, aHeader.mScale, -1.0f));
}
