// GeoTIFF quick-looks: argument rules, statistics and stretch against direct
// formulas, the inverse mapping a header reader applies, the TIFF fields,
// palette and GeoTIFF keys read back with libtiff/libgeotiff, the argument
// vector, progress and interruption, and bad input with no TIFF left behind.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <filesystem>
#include <functional>
#include <iterator>
#include <random>
#include <sstream>
#include <string>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

#include "tlrx_command_test_support.h"
#include "tlrx_description_section.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_geotiff_file.h"
#include "tlrx_generic_utility.h"
#include "tlrx_geotiff_georef.h"
#include "tlrx_geotiff_stretch.h"
#include "tlrx_geotiff_test_support.h"
#include "tlrx_platform.h"
#include "tlrx_raster_to_geotiff.h"
#include "tlrx_standard_header.h"
#include "tlrx_test_support.h"

namespace {

constexpr double sPi = 3.14159265358979323846;
constexpr double sThird = 1.0 / 3.0;

void noSleep(double) {}

// Mean of the values in the central third, every second row and column.
double centralThirdMean(const std::vector<float> &theValues, int theRows, int theCols,
                        const std::function<bool(float)> &theValid = [](float) { return true; }) {
  double aSum = 0.0;
  int aCount = 0;
  for (int r = theRows / 2 - theRows / 6; r <= theRows / 2 + theRows / 6; r += 2)
    for (int c = theCols / 2 - theCols / 6; c <= theCols / 2 + theCols / 6; c += 2)
      if (theValid(theValues[size_t(r) * theCols + c])) {
        aSum += theValues[size_t(r) * theCols + c];
        ++aCount;
      }
  return aSum / aCount;
}

int roundHalfUp(double theValue) { return static_cast<int>(std::floor(theValue + 0.5)); }

// What a reader of the quick-look's header does with a grey level.
struct SHeaderStretch {
  double mMin, mMax, mScale, mExponent, mNull;
  int mRowScale, mColScale, mLines, mPixels;
  std::string mCellType;
  double value(int theLevel) const { return mMin + std::pow(theLevel / mScale, 1.0 / mExponent); }
};

SHeaderStretch readTiffHeader(const std::string &theTiff) {
  CDescription aHeader;
  fdfDeclareStandardHeader(aHeader);
  EXPECT_TRUE(aHeader.readFromFile((theTiff + "_hdr").c_str(), false)) << theTiff;
  return {aHeader.getField("RasterInfo.TiffMinValue").getDouble(),
          aHeader.getField("RasterInfo.TiffMaxValue").getDouble(),
          aHeader.getField("RasterInfo.TiffScale").getDouble(),
          aHeader.getField("RasterInfo.TiffExponent").getDouble(),
          aHeader.getField("RasterInfo.NullCellValue").getDouble(),
          aHeader.getField("RasterInfo.TiffRowScale").getInteger(),
          aHeader.getField("RasterInfo.TiffColScale").getInteger(),
          aHeader.getField("RasterInfo.NrOfLinesPerImage").getInteger(),
          aHeader.getField("RasterInfo.NrOfPixelsPerLine").getInteger(),
          aHeader.getField("RasterInfo.CellType").getString()};
}

std::vector<float> rampValues(int theRows, int theCols) {
  std::vector<float> aValues(size_t(theRows) * theCols);
  for (int r = 0; r < theRows; ++r)
    for (int c = 0; c < theCols; ++c)
      aValues[size_t(r) * theCols + c] = static_cast<float>(1 + (r * 7 + c * 13) % 50);
  return aValues;
}

class GeoTiffTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override {
    tlrxStartLibraryEnvironment(mDir.path());
    fdfSetSleepFunction(noSleep);
    tlrxWriteFile(fdfGetWorkingFilePath(), "0\n\n");
  }
  std::string file(const std::string &theName) const { return mDir.file(theName); }

  int32_t convert(const std::string &theIn, const std::string &theOut, double theSaturation = 0.0,
                  int32_t theRowRed = 1, int32_t theColRed = 1, double theGain = 1.0, double theExponent = 1.0,
                  bool theInvertRows = false, bool theInvertCols = false, bool theHistogram = false,
                  int32_t theClasses = 1000000) {
    return tlrx_raster_to_geotiff(file(theIn).c_str(), file(theOut).c_str(), theSaturation, theRowRed, theColRed,
                                  theGain, theExponent, theInvertRows, theInvertCols, false, theHistogram, 254,
                                  theClasses, nullptr, nullptr, -1, -1, -1, -1, false);
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

// ---------------------------------------------------------------- pure rules

TEST(GeoTiffRules, ArgumentsOutsideTheirDomainTakeTheDefaults) {
  EXPECT_DOUBLE_EQ(fdfTiffSaturation(0.0), sThird);
  EXPECT_DOUBLE_EQ(fdfTiffSaturation(1.0e-39), sThird);
  EXPECT_DOUBLE_EQ(fdfTiffSaturation(-0.5), sThird);
  EXPECT_DOUBLE_EQ(fdfTiffSaturation(std::nan("")), sThird);
  EXPECT_DOUBLE_EQ(fdfTiffSaturation(0.5), 0.5);
  EXPECT_EQ(fdfTiffReductionFactor(0), 1);
  EXPECT_EQ(fdfTiffReductionFactor(-3), 1);
  EXPECT_EQ(fdfTiffReductionFactor(4), 4);
  EXPECT_DOUBLE_EQ(fdfTiffGain(-2.0), 1.0);
  EXPECT_DOUBLE_EQ(fdfTiffGain(0.0), 1.0);
  EXPECT_DOUBLE_EQ(fdfTiffGain(2.5), 2.5);
  EXPECT_DOUBLE_EQ(fdfTiffExponent(-1.0), 1.0);
  EXPECT_DOUBLE_EQ(fdfTiffExponent(-0.9), 1.0);
  EXPECT_DOUBLE_EQ(fdfTiffExponent(-0.89), -0.89);
  EXPECT_DOUBLE_EQ(fdfTiffExponent(0.0), 1.0);
  EXPECT_DOUBLE_EQ(fdfTiffExponent(0.5), 0.5);
  EXPECT_EQ(fdfTiffLevels(0), 254);
  EXPECT_EQ(fdfTiffLevels(255), 254);
  EXPECT_EQ(fdfTiffLevels(100), 100);
}

TEST(GeoTiffRules, SampleStatisticsMatchTwoPassFormulas) {
  std::mt19937 aRandom(7);
  std::uniform_real_distribution<double> aUniform(-5.0, 1.0e4);
  std::vector<double> aValues(5001);
  for (double &aValue : aValues)
    aValue = 1.0e6 + aUniform(aRandom); // a large offset tests the variance's stability
  CTiffSample aSample;
  double aSum = 0.0, aSqrtSum = 0.0;
  for (double aValue : aValues) {
    aSample.add(aValue);
    aSum += aValue;
    aSqrtSum += std::sqrt(aValue);
  }
  const double aMean = aSum / aValues.size();
  double aSquares = 0.0;
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
  CTiffSample aPositive;
  for (double aValue : {4.0, 9.0, 16.0, 25.0})
    aPositive.add(aValue); // mean 13.5, amplitude mean 3.5
  STLRXStretchRequest aRequest;
  aRequest.mSaturation = 0.5;
  aRequest.mGain = 2.0;
  aRequest.mExponent = 0.8;
  STLRXStretch aGeneral = fdfMakeStretch(aRequest, aPositive);
  EXPECT_DOUBLE_EQ(aGeneral.mScale, 254 * 0.5 * 2.0 / std::pow(13.5, 0.8));
  EXPECT_DOUBLE_EQ(aGeneral.mExponent, 0.8);
  EXPECT_DOUBLE_EQ(aGeneral.mOrigin, 0.0);
  EXPECT_EQ(aGeneral.level(13.5), 254); // the mean lands on L s g = 254
  aRequest.mFamily = ETLRXTiffFamily::kIntensity;
  STLRXStretch aIntensity = fdfMakeStretch(aRequest, aPositive);
  EXPECT_DOUBLE_EQ(aIntensity.mScale, 254 * 0.5 * 2.0 / std::pow(3.5, 0.8));
  EXPECT_DOUBLE_EQ(aIntensity.mExponent, 0.4);
  aRequest.mFamily = ETLRXTiffFamily::kRaw;
  STLRXStretch aRaw = fdfMakeStretch(aRequest, aPositive);
  EXPECT_DOUBLE_EQ(aRaw.mScale, 2.0);
  EXPECT_DOUBLE_EQ(aRaw.mExponent, 0.8);

  CTiffSample aSigned;
  for (double aValue : {-3.0, 1.0, 8.0})
    aSigned.add(aValue); // mean 2
  aRequest.mFamily = ETLRXTiffFamily::kIntensity; // negative intensities keep the exponent 1
  STLRXStretch aCentred = fdfMakeStretch(aRequest, aSigned);
  EXPECT_DOUBLE_EQ(aCentred.mScale, 0.5 * 254 * 0.5 * 2.0 / 2.0);
  EXPECT_DOUBLE_EQ(aCentred.mExponent, 1.0);
  EXPECT_EQ(aCentred.level(0.0), 127);
  EXPECT_EQ(aCentred.level(2.0), 127 + roundHalfUp(2.0 * aCentred.mScale - 0.0));

  CTiffSample aZeroMean;
  aZeroMean.add(-1.0);
  aZeroMean.add(1.0);
  aRequest.mFamily = ETLRXTiffFamily::kGeneral;
  EXPECT_DOUBLE_EQ(fdfMakeStretch(aRequest, aZeroMean).mScale, 0.5 * 254 * 0.5 * 2.0 / 254.0);
}

TEST(GeoTiffRules, InverseMapsEveryLevelBackWithinItsWidth) {
  CTiffSample aSample;
  for (double aValue : {2.0, 40.0, 90.0})
    aSample.add(aValue);
  CTiffSample aSigned;
  for (double aValue : {-20.0, 5.0, 30.0})
    aSigned.add(aValue);
  std::vector<std::pair<STLRXStretch, CTiffSample>> aCases;
  for (double aExponent : {1.0, 0.5, 0.7, 1.6}) {
    STLRXStretchRequest aRequest;
    aRequest.mExponent = aExponent;
    aCases.emplace_back(fdfMakeStretch(aRequest, aSample), aSample);
  }
  STLRXStretchRequest aPlain;
  aCases.emplace_back(fdfMakeStretch(aPlain, aSigned), aSigned);
  const double aLow = 10.0, aHigh = 60.0;
  aPlain.mForcedMin = &aLow;
  aPlain.mForcedMax = &aHigh;
  aCases.emplace_back(fdfMakeStretch(aPlain, aSample), aSample);
  std::mt19937 aRandom(11);
  for (const auto &[aStretch, aUsed] : aCases) {
    const double aFirst = aStretch.mOrigin, aLast = aStretch.maxValue();
    std::uniform_real_distribution<double> aUniform(aFirst, aLast);
    for (int i = 0; i < 2000; ++i) {
      const double aValue = aUniform(aRandom);
      const int aLevel = aStretch.level(aValue);
      ASSERT_LE(aLevel, 254);
      // The level's width in values, from the documented formula.
      const STLRXStretch &aShape = aStretch;
      const auto aEdge = [&](double theLevel) {
        return aShape.mOrigin + std::pow(std::max(theLevel, 0.0) / aShape.mScale, 1.0 / aShape.mExponent);
      };
      const double aWidth = aEdge(aLevel + 0.5) - aEdge(aLevel - 0.5);
      EXPECT_LE(std::fabs(aStretch.value(aLevel) - aValue), aWidth) << aValue << " level " << aLevel;
    }
  }
  // Phase: one level is 2 pi / 255 wide; compare on the circle.
  CTiffSample aAny;
  aAny.add(0.0);
  STLRXStretchRequest aPhase;
  aPhase.mFamily = ETLRXTiffFamily::kPhase;
  const STLRXStretch aWrap = fdfMakeStretch(aPhase, aAny);
  for (double aValue = -3 * sPi; aValue < 3 * sPi; aValue += 0.0137) {
    const double aBack = aWrap.value(aWrap.level(aValue));
    const double aDistance = std::fabs(std::remainder(aBack - aValue, 2 * sPi));
    EXPECT_LE(aDistance, sPi / 255 + 1e-12) << aValue;
  }
  EXPECT_EQ(aWrap.level(-sPi), 0);
  EXPECT_EQ(aWrap.level(0.0), 127);
  EXPECT_EQ(aWrap.level(sPi - 1e-9), 254);
}

TEST(GeoTiffRules, LevelsStayInRangeAndNullAndUnknownClassesGetLevel255) {
  CTiffSample aSample;
  aSample.add(10.0);
  STLRXStretchRequest aRequest;
  aRequest.mExponent = 0.6;
  const STLRXStretch aStretch = fdfMakeStretch(aRequest, aSample);
  const std::vector<double> aValues = {-1e300, -5.0, 0.0, 1e-300, 10.0, 1e6, 1e300};
  std::vector<uint8_t> aValid(aValues.size(), 1);
  aValid[3] = 0;
  std::vector<uint8_t> aOut(aValues.size());
  fdfStretchLine(aStretch, aValues.data(), aValid.data(), int32_t(aValues.size()), aOut.data());
  EXPECT_EQ(aOut[0], 0);
  EXPECT_EQ(aOut[2], 0);
  EXPECT_EQ(aOut[3], 255);
  EXPECT_EQ(aOut[6], 254);
  for (size_t i = 0; i < aOut.size(); ++i)
    if (i != 3)
      EXPECT_LE(aOut[i], 254);

  aRequest.mFamily = ETLRXTiffFamily::kClass;
  const STLRXStretch aClasses = fdfMakeStretch(aRequest, aSample);
  const std::vector<double> aNumbers = {0.0, 7.0, 254.0, 255.0, 300.0, -3.0, std::nan("")};
  std::vector<uint8_t> aAll(aNumbers.size(), 1);
  std::vector<uint8_t> aLevels(aNumbers.size());
  fdfStretchLine(aClasses, aNumbers.data(), aAll.data(), int32_t(aNumbers.size()), aLevels.data());
  EXPECT_EQ(aLevels, (std::vector<uint8_t>{0, 7, 254, 255, 255, 255, 255}));
  EXPECT_DOUBLE_EQ(aClasses.value(7), 7.0);
}

TEST(GeoTiffRules, ForcedLimitsPinTheStretchWindow) {
  CTiffSample aSample;
  for (double aValue : {1.0, 2.0, 3.0})
    aSample.add(aValue);
  const double aLow = 100.0, aHigh = 300.0, aBad = 50.0;
  STLRXStretchRequest aRequest;
  aRequest.mForcedMin = &aLow;
  aRequest.mForcedMax = &aHigh;
  const STLRXStretch aBoth = fdfMakeStretch(aRequest, aSample);
  EXPECT_EQ(aBoth.level(100.0), 0);
  EXPECT_EQ(aBoth.level(300.0), 254);
  EXPECT_EQ(aBoth.level(200.0), 127);
  EXPECT_DOUBLE_EQ(aBoth.maxValue(), 300.0);
  aRequest.mForcedMax = &aBad; // below the minimum: the window is ignored
  const STLRXStretch aIgnored = fdfMakeStretch(aRequest, aSample);
  STLRXStretchRequest aPlain;
  EXPECT_DOUBLE_EQ(aIgnored.mScale, fdfMakeStretch(aPlain, aSample).mScale);
  EXPECT_DOUBLE_EQ(aIgnored.mOrigin, 0.0);
}

TEST(GeoTiffRules, HistogramTableEqualisesTheSample) {
  EXPECT_FALSE(CTiffHistogramLut::validClassCount(1));
  EXPECT_TRUE(CTiffHistogramLut::validClassCount(2));
  EXPECT_FALSE(CTiffHistogramLut::validClassCount(CTLRX_TIFF_MAX_HISTOGRAM_CLASSES + 1));
  // Skewed sample: values v = u^3 of uniform u; equalised levels follow u,
  // up to the share of the sample that falls into the value's class.
  const int aClasses = 100000, aCount = 20000;
  CTiffHistogramLut aLut(0.0, 1000.0, aClasses, 254);
  std::vector<double> aValues;
  std::vector<int> aClassCount(aClasses, 0);
  for (int i = 0; i < aCount; ++i) {
    const double aU = (i + 0.5) / aCount;
    aValues.push_back(1000.0 * aU * aU * aU);
    aLut.add(aValues.back());
    ++aClassCount[std::min(aClasses - 1, int(aValues.back() / 1000.0 * aClasses))];
  }
  ASSERT_TRUE(aLut.equalise());
  int aPrevious = 0;
  for (size_t i = 0; i < aValues.size(); i += 97) {
    const int aLevel = aLut.level(aValues[i]);
    const double aU = (i + 0.5) / aCount;
    const double aShare = aClassCount[std::min(aClasses - 1, int(aValues[i] / 1000.0 * aClasses))] / double(aCount);
    EXPECT_NEAR(aLevel, 254.0 * aU, 254.0 * aShare / 2 + 1.0) << aValues[i];
    EXPECT_GE(aLevel, aPrevious);
    aPrevious = aLevel;
    // The level's value lies among the values given that level.
    EXPECT_EQ(aLut.level(aLut.levelValue(aLevel)), aLevel);
  }
  CTiffHistogramLut aConstant(5.0, 5.0, 10, 254);
  aConstant.add(5.0);
  ASSERT_TRUE(aConstant.equalise());
  EXPECT_EQ(aConstant.level(5.0), 127);
}

TEST(GeoTiffRules, BlocksAverageTheirValidCellsOrKeepTheirCentre) {
  // Two output cells of 3 columns, two rows per block.
  const std::vector<double> aRow0 = {1, 2, 3, 10, 20, 30};
  const std::vector<uint8_t> aValid0 = {1, 0, 1, 0, 0, 0};
  const std::vector<double> aRow1 = {5, 6, 7, 40, 50, 60};
  const std::vector<uint8_t> aValid1 = {1, 1, 1, 0, 0, 0};
  CTiffBlockReducer aAverage(ETLRXBlockRule::kAverage, 2, 3);
  aAverage.startBlock();
  aAverage.addRow(aRow0.data(), aValid0.data());
  aAverage.addRow(aRow1.data(), aValid1.data());
  double aOut[2];
  uint8_t aValid[2];
  aAverage.finishBlock(aOut, aValid);
  EXPECT_DOUBLE_EQ(aOut[0], (1 + 3 + 5 + 6 + 7) / 5.0);
  EXPECT_EQ(aValid[0], 1);
  EXPECT_EQ(aValid[1], 0);
  CTiffBlockReducer aCentre(ETLRXBlockRule::kCentre, 2, 3);
  aCentre.startBlock();
  aCentre.addRow(aRow1.data(), aValid0.data());
  aCentre.finishBlock(aOut, aValid);
  EXPECT_DOUBLE_EQ(aOut[0], 6.0);
  EXPECT_EQ(aValid[0], 0); // the centre cell of row 0's mask is null
}

// ---------------------------------------------------------------- conversions

TEST_F(GeoTiffTest, AmplitudeRasterFollowsTheDirectStretchAndReadsBack) {
  const int aRows = 30, aCols = 24;
  const std::vector<float> aValues = rampValues(aRows, aCols);
  tlrxWriteFloatRaster(file("amp"), aRows, aCols, aValues, "AMPLITUDE");
  ASSERT_EQ(convert("amp", "amp.tif"), 0);

  const double aScale = 254.0 * sThird / centralThirdMean(aValues, aRows, aCols);
  const STLRXTiffImage aTiff = tlrxReadTiff(file("amp.tif"));
  ASSERT_EQ(aTiff.mWidth, uint32_t(aCols));
  ASSERT_EQ(aTiff.mLength, uint32_t(aRows));
  EXPECT_EQ(aTiff.mRowsPerStrip, 20u);
  EXPECT_EQ(aTiff.mBitsPerSample, 8);
  EXPECT_EQ(aTiff.mPhotometric, PHOTOMETRIC_MINISBLACK);
  EXPECT_TRUE(aTiff.mRed.empty());
  EXPECT_EQ(aTiff.mSoftware, fdfGetBanner());
  EXPECT_EQ(aTiff.mDocumentName, file("amp"));
  const SHeaderStretch aHeader = readTiffHeader(file("amp.tif"));
  EXPECT_TRUE(tlrxFileExists(file("amp.tif.sml")));
  EXPECT_EQ(aHeader.mCellType, "UNSIGNED_BYTE");
  EXPECT_DOUBLE_EQ(aHeader.mNull, 255.0);
  EXPECT_NEAR(aHeader.mScale, aScale, 1e-12 * aScale);
  EXPECT_DOUBLE_EQ(aHeader.mExponent, 1.0);
  EXPECT_DOUBLE_EQ(aHeader.mMin, 0.0);
  EXPECT_NEAR(aHeader.mMax, 254.0 / aScale, 1e-9);
  EXPECT_EQ(aHeader.mRowScale, 1);
  EXPECT_EQ(aHeader.mColScale, 1);
  for (int r = 0; r < aRows; ++r)
    for (int c = 0; c < aCols; ++c) {
      const double aValue = aValues[size_t(r) * aCols + c];
      const int aExpected = std::min(254, roundHalfUp(aScale * aValue));
      ASSERT_EQ(aTiff.at(r, c), aExpected) << r << "," << c;
      if (aExpected < 254) // a reader gets the value back within one level's width
        EXPECT_LE(std::fabs(aHeader.value(aTiff.at(r, c)) - aValue), 1.0 / aHeader.mScale);
    }
  EXPECT_EQ(tiffFiles(), std::vector<std::string>{"amp.tif"});
}

// A reduction beyond the image keeps one pixel on that side.
TEST_F(GeoTiffTest, ReductionBeyondTheImageKeepsOnePixel) {
  tlrxWriteFloatRaster(file("r"), 18, 15, rampValues(18, 15), "AMPLITUDE");
  ASSERT_EQ(convert("r", "huge.tif", 0.0, 100, 1), 0);
  EXPECT_EQ(tlrxReadTiff(file("huge.tif")).mLength, 1u);
}

TEST_F(GeoTiffTest, SignedIntensitiesAndNullCells) {
  // Signed data: 0 on level 127, the exponent not applied.
  const int aRows = 12, aCols = 12;
  std::vector<float> aSigned(aRows * aCols);
  for (int r = 0; r < aRows; ++r)
    for (int c = 0; c < aCols; ++c)
      aSigned[size_t(r) * aCols + c] = static_cast<float>((r * 5 + c * 3) % 21 - 10);
  aSigned[0] = 0.0f;
  const double aNoData = -9999.0; // 0 would be the null value without one
  tlrxWriteFloatRaster(file("db"), aRows, aCols, aSigned, "RATIO", &aNoData);
  ASSERT_EQ(convert("db", "db.tif", 0.0, 1, 1, 1.0, 2.0), 0);
  const double aMean = centralThirdMean(aSigned, aRows, aCols);
  const double aScale = 0.5 * 254 * sThird / std::fabs(aMean);
  const STLRXTiffImage aDb = tlrxReadTiff(file("db.tif"));
  EXPECT_EQ(aDb.at(0, 0), 127);
  for (size_t i = 0; i < aSigned.size(); ++i)
    ASSERT_EQ(aDb.mPixels[i], std::clamp(127 + roundHalfUp(aScale * aSigned[i]), 0, 254)) << i;
  EXPECT_DOUBLE_EQ(readTiffHeader(file("db.tif")).mExponent, 1.0);

  // Intensities are stretched as amplitudes; null cells get level 255.
  std::vector<float> aPower = rampValues(aRows, aCols);
  const double aNull = -1.0;
  aPower[5] = -1.0f;
  aPower[size_t(6) * aCols + 6] = -1.0f; // inside the sample: skipped
  tlrxWriteFloatRaster(file("pow"), aRows, aCols, aPower, "POWER", &aNull);
  ASSERT_EQ(convert("pow", "pow.tif", 0.5, 1, 1, 1.0, 1.0), 0);
  double aAmpSum = 0.0;
  int aAmpCount = 0;
  for (int r = 4; r <= 8; r += 2) // the central third of 12 x 12, every second cell
    for (int c = 4; c <= 8; c += 2)
      if (aPower[size_t(r) * aCols + c] >= 0.0f) {
        aAmpSum += std::sqrt(double(aPower[size_t(r) * aCols + c]));
        ++aAmpCount;
      }
  const double aAmpScale = 254 * 0.5 / (aAmpSum / aAmpCount);
  const STLRXTiffImage aPow = tlrxReadTiff(file("pow.tif"));
  const SHeaderStretch aHeader = readTiffHeader(file("pow.tif"));
  EXPECT_DOUBLE_EQ(aHeader.mExponent, 0.5);
  EXPECT_NEAR(aHeader.mScale, aAmpScale, 1e-12 * aAmpScale);
  for (size_t i = 0; i < aPower.size(); ++i) {
    const int aExpected = aPower[i] < 0 ? 255 : std::min(254, roundHalfUp(aAmpScale * std::sqrt(aPower[i])));
    ASSERT_EQ(aPow.mPixels[i], aExpected) << i;
  }
}

TEST_F(GeoTiffTest, ComplexSlcIsShownAsAmplitude) {
  const int aRows = 9, aCols = 9;
  std::vector<int16_t> aCells(size_t(aRows) * aCols * 2);
  std::vector<float> aAmplitude(size_t(aRows) * aCols);
  for (size_t i = 0; i < aAmplitude.size(); ++i) {
    aCells[2 * i] = int16_t(3 * (i % 7) + 1);
    aCells[2 * i + 1] = int16_t(-4 * (i % 5));
    aAmplitude[i] = static_cast<float>(std::hypot(aCells[2 * i], aCells[2 * i + 1]));
  }
  CDescription aHeader;
  tlrxGeoTiffHeader(aHeader, aRows, aCols, "SHORT_COMPLEX", "SLC");
  tlrxWriteGeoTiffRaster(file("slc"), aHeader, aCells.data());
  ASSERT_EQ(convert("slc", "slc.tif"), 0);
  const double aScale = 254 * sThird / centralThirdMean(aAmplitude, aRows, aCols);
  const STLRXTiffImage aTiff = tlrxReadTiff(file("slc.tif"));
  for (size_t i = 0; i < aAmplitude.size(); ++i)
    ASSERT_EQ(aTiff.mPixels[i], std::min(254, roundHalfUp(aScale * aAmplitude[i]))) << i;
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
  const STLRXTiffImage aTiff = tlrxReadTiff(file("red.tif"));
  const STLRXTiffImage aFlip = tlrxReadTiff(file("flip.tif"));
  const SHeaderStretch aHeader = readTiffHeader(file("red.tif"));
  ASSERT_EQ(aTiff.mLength, 15u);
  ASSERT_EQ(aTiff.mWidth, 8u);
  EXPECT_EQ(aHeader.mLines, 15);
  EXPECT_EQ(aHeader.mPixels, 8);
  EXPECT_EQ(aHeader.mRowScale, 2);
  EXPECT_EQ(aHeader.mColScale, 3);
  for (int i = 0; i < 15; ++i)
    for (int j = 0; j < 8; ++j) {
      double aSum = 0.0;
      int aCount = 0;
      for (int r = 2 * i; r < 2 * i + 2; ++r)
        for (int c = 3 * j; c < 3 * j + 3; ++c)
          if (aValues[size_t(r) * aCols + c] != 0.0f) {
            aSum += aValues[size_t(r) * aCols + c];
            ++aCount;
          }
      const int aExpected = aCount == 0 ? 255 : std::min(254, roundHalfUp(aHeader.mScale * aSum / aCount));
      ASSERT_EQ(aTiff.at(i, j), aExpected) << i << "," << j;
      ASSERT_EQ(aFlip.at(14 - i, 7 - j), aExpected);
    }
  EXPECT_EQ(aTiff.at(1, 0), 255);
}

TEST_F(GeoTiffTest, HeaderInversionFlagsMirrorToo) {
  const std::vector<float> aValues = rampValues(6, 6);
  CDescription aHeader;
  tlrxGeoTiffHeader(aHeader, 6, 6, "FLOAT", "AMPLITUDE");
  aHeader.getField("RasterInfo.TiffRowsInvert") = "OK";
  tlrxWriteGeoTiffRaster(file("hf"), aHeader, aValues.data());
  tlrxWriteFloatRaster(file("plain"), 6, 6, aValues, "AMPLITUDE");
  ASSERT_EQ(convert("hf", "hf.tif"), 0);
  ASSERT_EQ(convert("plain", "plain.tif"), 0);
  const STLRXTiffImage aFlipped = tlrxReadTiff(file("hf.tif"));
  const STLRXTiffImage aPlain = tlrxReadTiff(file("plain.tif"));
  for (int r = 0; r < 6; ++r)
    for (int c = 0; c < 6; ++c)
      ASSERT_EQ(aFlipped.at(r, c), aPlain.at(5 - r, c));
}

TEST_F(GeoTiffTest, UtmSouthGeographicOtherAndNoState) {
  const std::vector<float> aValues = rampValues(20, 30);
  CDescription aHeader;
  tlrxGeoTiffHeader(aHeader, 20, 30, "FLOAT", "AMPLITUDE");
  tlrxGeoTiffUtm(aHeader, 32, "SOUTH", 500000.0, 7000000.0, 10.0, -15.0);
  tlrxWriteGeoTiffRaster(file("utm"), aHeader, aValues.data());
  ASSERT_EQ(convert("utm", "utm.tif", 0.0, 2, 4, 1.0, 1.0, false, true), 0);
  {
    const STLRXGeoKeys aKeys(file("utm.tif"));
    EXPECT_EQ(aKeys.shortValue(CTLRX_GT_MODEL_TYPE), 1);
    EXPECT_EQ(aKeys.shortValue(CTLRX_GT_RASTER_TYPE), 1);
    EXPECT_EQ(aKeys.shortValue(CTLRX_PROJECTED_CS_TYPE), 32732);
    EXPECT_EQ(aKeys.text(CTLRX_GT_CITATION), "UTM Zone 32S WGS84");
    EXPECT_EQ(aKeys.text(CTLRX_PCS_CITATION), "UTM Zone 32S  with WGS84");
    EXPECT_EQ(aKeys.shortValue(CTLRX_PROJ_LINEAR_UNITS), 9001);
    EXPECT_DOUBLE_EQ(aKeys.doubleValue(CTLRX_PROJ_LINEAR_UNIT_SIZE), 1.0);
  }
  // 30 / 4 = 7 columns of 40 m, mirrored: the tie point is the east edge.
  const STLRXTiffImage aUtm = tlrxReadTiff(file("utm.tif"));
  EXPECT_EQ(aUtm.mTiePoint, (std::vector<double>{0, 0, 0, 500000.0 + 7 * 40.0, 7000000.0, 0}));
  EXPECT_EQ(aUtm.mPixelScale, (std::vector<double>{-40.0, 30.0, 0}));
  const SHeaderStretch aTiffHeader = readTiffHeader(file("utm.tif"));
  EXPECT_EQ(aTiffHeader.mPixels, 7);

  CDescription aGeo;
  tlrxGeoTiffHeader(aGeo, 20, 30, "FLOAT", "AMPLITUDE");
  tlrxGeoTiffGeographic(aGeo, 11.5, 45.25, 0.001, -0.002);
  tlrxWriteGeoTiffRaster(file("geo"), aGeo, aValues.data());
  ASSERT_EQ(convert("geo", "geo.tif", 0.0, 1, 1, 1.0, 1.0, true, false), 0);
  {
    const STLRXGeoKeys aKeys(file("geo.tif"));
    EXPECT_EQ(aKeys.shortValue(CTLRX_GT_MODEL_TYPE), 2);
    EXPECT_EQ(aKeys.shortValue(CTLRX_GEOGRAPHIC_TYPE), 4326);
    EXPECT_EQ(aKeys.shortValue(CTLRX_GEOG_GEODETIC_DATUM), 6326);
    EXPECT_EQ(aKeys.shortValue(CTLRX_GEOG_ELLIPSOID), 7030);
    EXPECT_EQ(aKeys.shortValue(CTLRX_GEOG_PRIME_MERIDIAN), 8901);
    EXPECT_EQ(aKeys.shortValue(CTLRX_GEOG_ANGULAR_UNITS), 9102);
    EXPECT_NEAR(aKeys.doubleValue(CTLRX_GEOG_ANGULAR_UNIT_SIZE), sPi / 180.0, 1e-15);
    EXPECT_EQ(aKeys.text(CTLRX_GT_CITATION), "Geographic Model WGS 84");
    EXPECT_EQ(aKeys.text(CTLRX_GEOG_CITATION), "WGS 84 Ellipsoid Used");
  }
  const STLRXTiffImage aGeoTiff = tlrxReadTiff(file("geo.tif"));
  ASSERT_EQ(aGeoTiff.mTiePoint.size(), 6u);
  EXPECT_DOUBLE_EQ(aGeoTiff.mTiePoint[3], 11.5);
  EXPECT_DOUBLE_EQ(aGeoTiff.mTiePoint[4], 45.25 - 20 * 0.002); // mirrored rows start at the south edge
  EXPECT_DOUBLE_EQ(aGeoTiff.mPixelScale[1], -0.002);

  CDescription aOther;
  tlrxGeoTiffHeader(aOther, 20, 30, "FLOAT", "AMPLITUDE");
  aOther.getField("CartographicSystem.State") = "LAMBERT72";
  aOther.getField("CartographicSystem.Hemisphere") = "NORTH";
  aOther.getField("CartographicSystem.Zone") = 31;
  tlrxWriteGeoTiffRaster(file("other"), aOther, aValues.data());
  ASSERT_EQ(convert("other", "other.tif"), 0);
  {
    const STLRXGeoKeys aKeys(file("other.tif"));
    EXPECT_EQ(aKeys.text(CTLRX_GT_CITATION), "| State =LAMBERT72| Hemisphere =NORTH| Zone =31");
    EXPECT_EQ(aKeys.shortValue(CTLRX_PROJ_LINEAR_UNITS), 9001);
    EXPECT_FALSE(aKeys.has(CTLRX_PROJECTED_CS_TYPE));
  }
  EXPECT_TRUE(tlrxReadTiff(file("other.tif")).mTiePoint.empty()); // no registration coordinates

  tlrxWriteFloatRaster(file("radar"), 20, 30, aValues, "AMPLITUDE");
  ASSERT_EQ(convert("radar", "radar.tif"), 0);
  {
    const STLRXGeoKeys aKeys(file("radar.tif"));
    EXPECT_EQ(aKeys.text(CTLRX_GT_CITATION), "No Geocoded Image");
    EXPECT_FALSE(aKeys.has(CTLRX_GT_MODEL_TYPE));
  }
  EXPECT_TRUE(tlrxReadTiff(file("radar.tif")).mTiePoint.empty());
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
  const STLRXTiffImage aTiff = tlrxReadTiff(file("ifg.tif"));
  EXPECT_EQ(aTiff.mPhotometric, PHOTOMETRIC_PALETTE);
  ASSERT_EQ(aTiff.mRed.size(), 256u);
  EXPECT_EQ(aTiff.mRed[200], 200 * 257);
  EXPECT_EQ(aTiff.mGreen[200], 55 * 257);
  EXPECT_EQ(aTiff.mBlue[255], 127 * 257);
  for (size_t i = 0; i < aPhase.size(); ++i) {
    const double aTurn = (aPhase[i] + sPi) / (2 * sPi);
    const int aExpected = int(std::floor((aTurn - std::floor(aTurn)) * 255.0)) % 255;
    const int aApart = std::abs(aTiff.mPixels[i] - aExpected);
    ASSERT_LE(std::min(aApart, 255 - aApart), 1) << i; // float cells blur exact edges; levels wrap
  }
  const SHeaderStretch aStretch = readTiffHeader(file("ifg.tif"));
  EXPECT_NEAR(aStretch.mMin, -sPi + sPi / 255, 1e-12);
  EXPECT_NEAR(aStretch.mScale, 255 / (2 * sPi), 1e-12);

  CDescription aBare;
  tlrxGeoTiffHeader(aBare, aRows, aCols, "FLOAT_COMPLEX", "FLATTENED INTERFEROGRAMME");
  tlrxWriteGeoTiffRaster(file("flat"), aBare, aCells.data());
  ASSERT_EQ(convert("flat", "flat.tif"), 0);
  const STLRXTiffImage aWheel = tlrxReadTiff(file("flat.tif"));
  ASSERT_EQ(aWheel.mRed.size(), 256u);
  EXPECT_EQ(aWheel.mRed[0], 65535);
  EXPECT_EQ(aWheel.mGreen[0], 0);
  EXPECT_EQ(aWheel.mRed[255] + aWheel.mGreen[255] + aWheel.mBlue[255], 0); // null level is black

  tlrxWriteFloatRaster(file("amp"), aRows, aCols, std::vector<float>(aRows * aCols, 2.0f), "AMPLITUDE");
  ASSERT_EQ(convert("amp", "amp.tif"), 0);
  EXPECT_TRUE(tlrxReadTiff(file("amp.tif")).mRed.empty());
}

TEST_F(GeoTiffTest, ClassificationKeepsEveryClassNumberAsItsLevel) {
  const std::vector<float> aClasses = {0, 1, 2, 3, 4, 5, 0, 254, 300, -9, 7, 2, 0, 1, 1, 3};
  const double aNull = -9.0;
  tlrxWriteFloatRaster(file("cls"), 4, 4, aClasses, "CLASSIFICATION", &aNull);
  ASSERT_EQ(convert("cls", "cls.tif"), 0);
  const STLRXTiffImage aTiff = tlrxReadTiff(file("cls.tif"));
  for (size_t i = 0; i < aClasses.size(); ++i) {
    const int aExpected = aClasses[i] < 0 || aClasses[i] > 254 ? 255 : int(aClasses[i]);
    ASSERT_EQ(aTiff.mPixels[i], aExpected) << i;
  }
  const SHeaderStretch aHeader = readTiffHeader(file("cls.tif"));
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
  const STLRXTiffImage aTiff = tlrxReadTiff(file("h.tif"));
  // Equalised: the median pixel sits mid-range (a linear stretch of these
  // cubes would put it near level 32).
  std::vector<uint8_t> aSorted = aTiff.mPixels;
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
  std::vector<double> aTable{std::istream_iterator<double>(aStream), std::istream_iterator<double>()};
  ASSERT_EQ(aTable.size(), 255u);
  EXPECT_TRUE(std::is_sorted(aTable.begin(), aTable.end()));

  EXPECT_EQ(tlrxRaisedCode([&] { convert("h", "bad.tif", 0.0, 1, 1, 1.0, 1.0, false, false, true, 1); }), CTLRX_ERR_TIFF_HISTOGRAM);
  EXPECT_TRUE(tiffFiles() == std::vector<std::string>{"h.tif"});
}

// ---------------------------------------------------------------- failures

TEST_F(GeoTiffTest, CentralThirdOfNullsFailsEvenWithValidValuesElsewhere) {
  std::string aMessage;
  const int aRows = 30, aCols = 30;
  std::vector<float> aValues = rampValues(aRows, aCols);
  for (int r = 10; r <= 20; ++r)
    for (int c = 10; c <= 20; ++c)
      aValues[size_t(r) * aCols + c] = std::nanf("");
  tlrxWriteFloatRaster(file("holes"), aRows, aCols, aValues, "AMPLITUDE");
  EXPECT_EQ(tlrxRaisedCode([&] { convert("holes", "holes.tif"); }, &aMessage), CTLRX_ERR_TIFF_EMPTY_SAMPLE);
  EXPECT_EQ(aMessage, "Error: 0 non null points in the input file : " + file("holes"));
  EXPECT_TRUE(tiffFiles().empty());
  EXPECT_FALSE(tlrxFileExists(file("holes.tif.sml")));
  // A window given by the caller that holds valid values succeeds.
  ASSERT_EQ(tlrx_raster_to_geotiff(file("holes").c_str(), file("holes.tif").c_str(), 0.0, 1, 1, 1.0, 1.0, false,
                                   false, false, false, 254, 1000000, nullptr, nullptr, 0, 5, -1, -1, false),
            0);
}

TEST_F(GeoTiffTest, BadInputRaisesItsCodeAndLeavesNoTiff) {
  std::string aMessage;
  const std::vector<float> aValues = rampValues(9, 9);
  EXPECT_EQ(tlrxRaisedCode([&] { convert("absent", "a.tif"); }, &aMessage), CTLRX_ERR_TIFF_HEADER_MISSING);
  EXPECT_EQ(aMessage, "Error: missing parameter file " + file("absent_hdr"));

  tlrxWriteFloatRaster(file("nodata"), 9, 9, aValues, "AMPLITUDE");
  std::remove(file("nodata").c_str());
  EXPECT_EQ(tlrxRaisedCode([&] { convert("nodata", "b.tif"); }, &aMessage), CTLRX_ERR_TIFF_RASTER_OPEN);
  EXPECT_EQ(aMessage, "Wrong CRasterFile Status " + file("nodata"));

  tlrxWriteFloatRaster(file("ok"), 9, 9, aValues, "AMPLITUDE");
  EXPECT_EQ(tlrxRaisedCode([&] { convert("ok", "missing_dir/c.tif"); }, &aMessage), CTLRX_ERR_TIFF_CREATE);
  EXPECT_EQ(aMessage.rfind("failed in GTIFNew " + file("missing_dir/c.tif"), 0), 0u);

  // The TIFF's header cannot be created: no TIFF either.
  ASSERT_EQ(mkdir(file("d.tif.sml").c_str(), 0755), 0);
  EXPECT_EQ(tlrxRaisedCode([&] { convert("ok", "d.tif"); }, &aMessage), CTLRX_ERR_TIFF_HEADER_WRITE);
  EXPECT_EQ(aMessage, "Error while writing parameter file " + file("d.tif.sml"));
  EXPECT_TRUE(tiffFiles().empty());
}

TEST(GeoTiffTemporaries, OwnerIsReadOnlyFromATemporaryOfThatTiff) {
  const std::pair<const char *, int> aCases[] = {
      {"q.tif.tlrxtmp_4242.aB3xYz", 4242},      {"q.tif.tlrxtmp_1.000000", 1},
      {"q.tif.tlrxtmp_4242.aB3xY", 0},          {"q.tif.tlrxtmp_4242.aB3xYz7", 0},
      {"q.tif.tlrxtmp_4242.aB-xYz", 0},         {"q.tif.tlrxtmp_.aB3xYz", 0},
      {"q.tif.tlrxtmp_0.aB3xYz", 0},            {"q.tif.tlrxtmp_42a.aB3xYz", 0},
      {"q.tif.tlrxtmp_99999999999.aB3xYz", 0}, {"q.tif.tlrxtmp_4242.aB3xYz.sml", 0},
      {"r.tif.tlrxtmp_4242.aB3xYz", 0},         {"xq.tif.tlrxtmp_4242.aB3xYz", 0},
      {"q.tif.aB3xYz", 0},                      {"q.tif", 0},
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
      "q.tif.tlrxtmp_1.abc123",                             // owner alive
      "q.tif.tlrxtmp_" + std::to_string(getpid()) + ".abc124", // this process's own
      "r.tif.tlrxtmp_" + aDead + ".abc123",                 // another TIFF's
      "q.tif.tlrxtmp_" + aDead + ".abc12",                  // not such a name
      "q.tif.abc123",                                       // could be anyone's
  };
  tlrxWriteFloatRaster(file("ok"), 9, 9, rampValues(9, 9), "AMPLITUDE");
  tlrxWriteFile(file(aStale), "stale");
  for (const std::string &aName : aKept)
    tlrxWriteFile(file(aName), "keep");
  tlrxWriteFile(file("target"), "target");
  const std::string aLink = "q.tif.tlrxtmp_" + aDead + ".lnk123";
  const std::string aFolder = "q.tif.tlrxtmp_" + aDead + ".dir123";
  ASSERT_EQ(symlink(file("target").c_str(), file(aLink).c_str()), 0);
  ASSERT_EQ(mkdir(file(aFolder).c_str(), 0755), 0);

  ASSERT_EQ(convert("ok", "q.tif"), 0);
  EXPECT_FALSE(tlrxFileExists(file(aStale)));
  for (const std::string &aName : aKept)
    EXPECT_EQ(tlrxReadFile(file(aName)), "keep") << aName;
  struct stat aStat;
  EXPECT_EQ(lstat(file(aLink).c_str(), &aStat), 0);
  EXPECT_TRUE(S_ISLNK(aStat.st_mode));
  EXPECT_EQ(tlrxReadFile(file("target")), "target");
  EXPECT_TRUE(std::filesystem::is_directory(file(aFolder)));
  EXPECT_TRUE(tlrxFileExists(file("q.tif")));
}

TEST_F(GeoTiffTest, TemporaryNamesItsTiffAndItsWriter) {
  CGeoTiffFile aFile(file("t.tif"), 100);
  const std::string aName = std::filesystem::path(aFile.temporaryName()).filename().string();
  EXPECT_EQ(fdfTemporaryOwner("t.tif", CTLRX_TIFF_TEMPORARY_TAG, 6, aName), fdfProcessId()) << aName;
  EXPECT_EQ(std::filesystem::path(aFile.temporaryName()).parent_path(), std::filesystem::path(file("t.tif")).parent_path());
}

TEST_F(GeoTiffTest, ProgressReachesTheWritingPassAndInterruptionStops) {
  const std::vector<float> aValues = rampValues(40, 8);
  tlrxWriteFloatRaster(file("p"), 40, 8, aValues, "AMPLITUDE");
  ASSERT_EQ(convert("p", "p.tif"), 0);
  const std::vector<std::string> aLines = tlrxReadLines(fdfGetWorkingFilePath());
  ASSERT_FALSE(aLines.empty());
  EXPECT_EQ(aLines[0], std::to_string(30 + 70 * 39 / 40));

  tlrxWriteFile(fdfGetWorkingFilePath(), "101\n\n");
  EXPECT_EQ(tlrxRaisedCode([&] { convert("p", "stopped.tif"); }), CTLRX_ERR_INTERRUPTED);
  EXPECT_EQ(tiffFiles(), std::vector<std::string>{"p.tif"});
}

TEST_F(GeoTiffTest, ArgumentVectorEntry) {
  std::string aMessage;
  const std::vector<float> aValues = rampValues(12, 20);
  tlrxWriteFloatRaster(file("v"), 12, 20, aValues, "AMPLITUDE");
  std::string aName = "geotiff", aIn = file("v"), aOut = file("v.tif");
  char *aShort[] = {aName.data(), aIn.data()};
  EXPECT_EQ(tlrxRaisedCode([&] { make_tiff(2, aShort); }), CTLRX_ERR_TIFF_ARGUMENTS);
  EXPECT_EQ(fdfGetPEC(CTLRX_ERR_TIFF_ARGUMENTS), 2);

  // Two names only: every default.
  char *aTwo[] = {aName.data(), aIn.data(), aOut.data()};
  ASSERT_EQ(make_tiff(3, aTwo), 0);
  const SHeaderStretch aDefaults = readTiffHeader(aOut);
  EXPECT_NEAR(aDefaults.mScale, 254 * sThird / centralThirdMean(aValues, 12, 20), 1e-9);
  const STLRXTiffImage aPlain = tlrxReadTiff(aOut);

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
    std::vector<std::string> aArgs = {"geotiff", file("v"), file("bad.tif")};
    aArgs.insert(aArgs.end(), aBad.first.begin(), aBad.first.end());
    std::vector<char *> aArgv;
    for (std::string &aArg : aArgs)
      aArgv.push_back(aArg.data());
    EXPECT_EQ(tlrxRaisedCode([&] { make_tiff(int(aArgv.size()), aArgv.data()); }, &aMessage), CTLRX_ERR_TIFF_ARGUMENTS)
        << aBad.second;
    EXPECT_EQ(aMessage, aBad.second);
    EXPECT_FALSE(tlrxFileExists(file("bad.tif")));
  }

  std::vector<std::string> aArgs = {"geotiff", file("v"), file("w.tif"), "0", "2", "3", " 1 ", "-1",
                                    "ignored", "OK", "ok"};
  std::vector<char *> aArgv;
  for (std::string &aArg : aArgs)
    aArgv.push_back(aArg.data());
  ASSERT_EQ(make_tiff(int(aArgv.size()), aArgv.data()), 0);
  const SHeaderStretch aHeader = readTiffHeader(file("w.tif"));
  EXPECT_EQ(aHeader.mColScale, 2); // argv[4] is the column reduction
  EXPECT_EQ(aHeader.mRowScale, 3);
  EXPECT_DOUBLE_EQ(aHeader.mExponent, 1.0);
  EXPECT_DOUBLE_EQ(aHeader.mScale, aDefaults.mScale);
  const STLRXTiffImage aTiff = tlrxReadTiff(file("w.tif"));
  ASSERT_EQ(aTiff.mWidth, 10u);
  ASSERT_EQ(aTiff.mLength, 4u);
  // Columns mirrored ("OK"), rows not ("ok"): compare with the block means.
  for (int i = 0; i < 4; ++i)
    for (int j = 0; j < 10; ++j) {
      double aSum = 0.0;
      for (int r = 3 * i; r < 3 * i + 3; ++r)
        for (int c = 2 * j; c < 2 * j + 2; ++c)
          aSum += aValues[size_t(r) * 20 + c];
      ASSERT_EQ(aTiff.at(i, 9 - j), std::min(254, roundHalfUp(aHeader.mScale * aSum / 6)));
    }
  EXPECT_EQ(aPlain.mWidth, 20u);
}
