// Scene simulator: headers, geometry, no data and reproducibility; speckle and
// pair statistics against their theory on flat scenes; command-line errors.
#include "tlrx_command_test_support.h"
#include "tlrx_header_expect.h"
#include "tlrx_time_man_utility.h"

#include <cmath>
#include <complex>
#include <cstdlib>
#include <cstring>

namespace {

const double CTLRX_PI = 3.14159265358979323846;

class SimulateTest : public CommandTest {
protected:
  STLRXRun run(const std::vector<std::string> &theArgs) const { return tlrxRun("tlrx_simulate", theArgs, mDir.path()); }
};

struct SStats {
  double mMean = 0.0, mStd = 0.0;
  double cv() const { return mStd / mMean; }
};

SStats stats(const std::vector<double> &theValues) {
  SStats aStats;
  for (double aValue : theValues)
    aStats.mMean += aValue / theValues.size();
  for (double aValue : theValues)
    aStats.mStd += (aValue - aStats.mMean) * (aValue - aStats.mMean) / theValues.size();
  aStats.mStd = std::sqrt(aStats.mStd);
  return aStats;
}

double correlation(const std::vector<double> &theA, const std::vector<double> &theB) {
  const SStats aA = stats(theA), aB = stats(theB);
  double aCross = 0.0;
  for (size_t i = 0; i < theA.size(); ++i)
    aCross += (theA[i] - aA.mMean) * (theB[i] - aB.mMean);
  return aCross / theA.size() / (aA.mStd * aB.mStd);
}

// Values of a box of a raster of theWidth pixels per line.
std::vector<double> box(const std::vector<double> &theValues, int theWidth, int theLine0, int thePixel0, int theLines,
                        int thePixels) {
  std::vector<double> aBox;
  for (int l = theLine0; l < theLine0 + theLines; ++l)
    for (int p = thePixel0; p < thePixel0 + thePixels; ++p)
      aBox.push_back(theValues[static_cast<size_t>(l) * theWidth + p]);
  return aBox;
}

template <typename T> std::vector<T> rawCells(const std::string &thePath) {
  const std::string aBytes = tlrxReadFile(thePath);
  std::vector<T> aCells(aBytes.size() / sizeof(T));
  std::memcpy(aCells.data(), aBytes.data(), aCells.size() * sizeof(T));
  return aCells;
}

TEST_F(SimulateTest, SeriesHeadersHoldSizeTypeNullGivenOrRegularDatesAndUtmGrid) {
  simulate({"series", "--out", file("s"), "--count", "3", "--lines", "40", "--pixels", "50", "--cell-type", "SHORT",
            "--scale-factor", "0.01", "--null", "-9999", "--utm", "33S", "--origin", "600000,5100000", "--spacing",
            "20", "--start", "2020-02-27T23:59:59.25", "--interval", "1.5"});
  EXPECT_EQ(tlrxReadLines(file("s_list.txt")), (std::vector<std::string>{file("s_01"), file("s_02"), file("s_03")}));
  const char *const aTimes[3] = {"27-FEB-2020 23:59:59.250000", "29-FEB-2020 11:59:59.250000",
                                 "01-MAR-2020 23:59:59.250000"};
  STLRXDate aFirst, aDate;
  for (int k = 1; k <= 3; ++k) {
    const std::string aName = file("s_0" + std::to_string(k));
    tlrxExpectHeader(aName, "NrOfLinesPerImage=40;NrOfPixelsPerLine=50;CellType=SHORT;DataUnits=POWER;BytesOrder=LSBF;"
                            "NullCellValue=-9999;RealScaleFactor=0.01;ImaginaryScaleFactor=0.01;GeocodedImage=OK;"
                            "CartographicSystem.State=UTM-GLOBAL;Zone=33;Hemisphere=SOUTH;RegistrationCoordinates."
                            "LonEasting=600000;LatNorthing=5100000;PixelSpacingLonEast=20;PixelSpacingLatNorth=-20");
    // The acquisition time in the header form, and read as the commands read it.
    const std::string aTime = tlrxOtherInfo(aName, "ACQUISITION TIME");
    EXPECT_EQ(aTime, aTimes[k - 1]);
    ASSERT_TRUE(fdfParseAcquisitionDate(aTime, k == 1 ? aFirst : aDate));
    if (k > 1)
      EXPECT_NEAR(aDate.mDay - aFirst.mDay + (aDate.mSeconds - aFirst.mSeconds) / 86400.0, 1.5 * (k - 1), 1e-9);
    EXPECT_EQ(tlrxReadFile(aName).size(), 40u * 50u * 2u);
  }
  // Explicit dates are written in the given order.
  simulate({"series", "--out", file("d"), "--lines", "4", "--pixels", "4", "--dates",
            "2021-03-05T09:30:15.5,2021-01-10,2021-01-10T00:00"});
  const char *const aDates[3] = {"05-MAR-2021 09:30:15.500000", "10-JAN-2021 00:00:00.000000",
                                 "10-JAN-2021 00:00:00.000000"};
  for (int k = 1; k <= 3; ++k)
    EXPECT_EQ(tlrxOtherInfo(file("d_0" + std::to_string(k)), "ACQUISITION TIME"), aDates[k - 1]);
  EXPECT_FALSE(tlrxFileExists(file("d_04")));
}

TEST_F(SimulateTest, GeographicSeriesWithOtherGridForOneImageAndBoxesOnTheGround) {
  simulate({"series", "--out", file("g"), "--count", "3", "--lines", "30", "--pixels", "20", "--geographic",
            "--origin", "11,46", "--spacing", "0.0002", "--image-size", "3:10,12", "--image-origin", "3:11.001,45.999",
            "--image-spacing", "3:0.0004,0.0005"});
  tlrxExpectHeader(file("g_01"), "CartographicSystem.State=GEO-GLOBAL;Units=Degrees;RegistrationCoordinates.LonEasting="
                                 "11;LatNorthing=46;PixelSpacingLonEast=0.0002;PixelSpacingLatNorth=-0.0002");
  tlrxExpectHeader(file("g_03"), "NrOfLinesPerImage=10;NrOfPixelsPerLine=12;RegistrationCoordinates.LonEasting=11.001;"
                                 "LatNorthing=45.999;PixelSpacingLonEast=0.0004;PixelSpacingLatNorth=-0.0005");
  EXPECT_EQ(tlrxReadFile(file("g_03")).size(), 10u * 12u * 4u);
  // Boxes are positions on the ground: an image whose corner lies 10 pixels
  // east and 5 lines south of the reference grid sees the box shifted back.
  simulate({"series", "--out", file("u"), "--count", "2", "--lines", "40", "--pixels", "40", "--utm", "32N",
            "--origin", "600000,5100000", "--spacing", "20", "--image-origin", "2:600200,5099900", "--nodata-box",
            "20,30,4,6", "--null", "-1"});
  for (int k = 1; k <= 2; ++k) {
    const std::vector<float> aCells = rawCells<float>(file("u_0" + std::to_string(k)));
    const int aLines = k == 1 ? 0 : 5, aPixels = k == 1 ? 0 : 10;
    for (int l = 0; l < 40; ++l)
      for (int p = 0; p < 40; ++p) {
        const bool aInBox = l + aLines >= 20 && l + aLines < 24 && p + aPixels >= 30 && p + aPixels < 36;
        EXPECT_EQ(aCells[l * 40 + p] == -1.0f, aInBox) << "image " << k << " line " << l << " pixel " << p;
      }
  }
}

// Flat scenes: intensity of the reflectivity's mean and a variation of one
// over the root of the looks; single-look amplitude follows the Rayleigh law.
// Every cell type keeps the statistics of the intensity read back (scale
// factors applied, complex cells as re^2 + im^2), and no valid pixel reads as
// the null value 0 although many small values round to it.
TEST_F(SimulateTest, SpeckleHasTheTheoreticalMeanAndVariationInEveryCellType) {
  struct SCase {
    std::vector<std::string> mArgs;
    std::string mHeader;
    double mMean, mMeanTolerance, mCv, mCvTolerance;
  };
  std::vector<SCase> aCases = {
      {{"--reflectivity", "2.5"}, "CellType=FLOAT;DataUnits=POWER", 2.5, 0.05, 1.0, 0.03},
      {{"--looks", "4", "--reflectivity", "0.3"}, "DataUnits=POWER", 0.3, 0.006, 0.5, 0.015},
      {{"--looks", "16", "--reflectivity", "0.3"}, "DataUnits=POWER", 0.3, 0.006, 0.25, 0.015},
      {{"--units", "AMPLITUDE", "--reflectivity", "4"}, "DataUnits=AMPLITUDE", std::sqrt(CTLRX_PI), 0.02,
       std::sqrt(4.0 / CTLRX_PI - 1.0), 0.01}};
  const std::pair<const char *, const char *> aCellTypes[] = {
      {"DOUBLE", "1"},          {"SHORT", "0.002"},       {"UNSIGNED_SHORT", "0.002"}, {"INT", "0.000001"},
      {"UNSIGNED_INT", "0.000001"}, {"BYTE", "0.1"},      {"UNSIGNED_BYTE", "0.05"},   {"FLOAT_COMPLEX", "1"},
      {"DOUBLE_COMPLEX", "1"},  {"SHORT_COMPLEX", "0.001"}, {"UNSIGNED_SHORT_COMPLEX", "0.001"},
      {"BYTE_COMPLEX", "0.03"}, {"UBYTE_COMPLEX", "0.03"}};
  for (const auto &aType : aCellTypes)
    aCases.push_back({{"--lines", "128", "--pixels", "128", "--cell-type", aType.first, "--scale-factor", aType.second},
                      std::string("CellType=") + aType.first + ";DataUnits=" +
                          (std::strstr(aType.first, "COMPLEX") != nullptr ? "SLC" : "POWER"),
                      1.0, 0.05, 1.0, 0.06});
  for (const SCase &aCase : aCases) {
    std::vector<std::string> aArgs = {"series", "--out", file("i"), "--count", "1", "--scene", "flat"};
    aArgs.insert(aArgs.end(), aCase.mArgs.begin(), aCase.mArgs.end());
    SCOPED_TRACE(aCase.mHeader + " " + aCase.mArgs[1]);
    simulate(aArgs);
    tlrxExpectHeader(file("i_01"), aCase.mHeader);
    const std::vector<double> aValues = tlrxReadTestRaster(file("i_01"));
    const SStats aStats = stats(aValues);
    EXPECT_NEAR(aStats.mMean, aCase.mMean, aCase.mMeanTolerance);
    EXPECT_NEAR(aStats.cv(), aCase.mCv, aCase.mCvTolerance);
    EXPECT_EQ(std::count(aValues.begin(), aValues.end(), 0.0), 0);
  }
}

TEST_F(SimulateTest, ChangeTrendAndTextureOfTheScene) {
  simulate({"series", "--out", file("c"), "--count", "4", "--scene", "flat", "--lines", "128", "--pixels", "128",
            "--change", "32,16,64,48,3,4"});
  simulate({"series", "--out", file("t"), "--count", "3", "--scene", "flat", "--looks", "4", "--trend",
            "0,0,256,256,3"});
  for (int k = 1; k <= 4; ++k) {
    const std::vector<double> aValues = tlrxReadTestRaster(file("c_0" + std::to_string(k)));
    EXPECT_NEAR(stats(box(aValues, 128, 32, 16, 64, 48)).mMean, k >= 3 ? 4.0 : 1.0, k >= 3 ? 0.25 : 0.06) << k;
    EXPECT_NEAR(stats(box(aValues, 128, 0, 64, 128, 64)).mMean, 1.0, 0.05) << k;
    const double aTrend = std::pow(10.0, 0.3 * (k - 1));
    if (k <= 3)
      EXPECT_NEAR(stats(tlrxReadTestRaster(file("t_0" + std::to_string(k)))).mMean, aTrend, 0.02 * aTrend) << k;
  }
  // A textured scene keeps its flat boxes at the reflectivity.
  simulate({"series", "--out", file("f"), "--count", "1", "--looks", "16", "--flat-box", "0,0,64,64",
            "--reflectivity", "2", "--contrast-db", "20"});
  const std::vector<double> aValues = tlrxReadTestRaster(file("f_01"));
  const SStats aFlat = stats(box(aValues, 256, 0, 0, 64, 64));
  EXPECT_NEAR(aFlat.mMean, 2.0, 0.03);
  EXPECT_NEAR(aFlat.cv(), 0.25, 0.01);
  // Outside, fields of 20 dB spread vary far beyond the speckle of 16 looks.
  EXPECT_GT(stats(box(aValues, 256, 64, 64, 192, 192)).cv(), 0.5);
}

TEST_F(SimulateTest, NoDataPixelsAreExactlyTheNullValueAndOnlyThem) {
  // 16-bit cells of step 0.01 with null 0: about 1% of the speckle values
  // round to 0 and must be moved off it.
  for (const char *aRoot : {"n", "h"})
    simulate({"series", "--out", file(aRoot), "--nodata-fraction", aRoot[0] == 'n' ? "0" : "0.1", "--count", "2",
              "--scene", "flat", "--cell-type", "SHORT", "--scale-factor", "0.01", "--nodata-box", "10,20,30,40",
              "--nodata-box", "100,100,8,8,2"});
  for (int k = 1; k <= 2; ++k) {
    const std::vector<int16_t> aClean = rawCells<int16_t>(file("n_0" + std::to_string(k)));
    const std::vector<int16_t> aHoles = rawCells<int16_t>(file("h_0" + std::to_string(k)));
    ASSERT_EQ(aClean.size(), 256u * 256u);
    int aRandomHoles = 0, aOutside = 0;
    for (int l = 0; l < 256; ++l)
      for (int p = 0; p < 256; ++p) {
        const size_t i = static_cast<size_t>(l) * 256 + p;
        const bool aInBox =
            (l >= 10 && l < 40 && p >= 20 && p < 60) || (k == 2 && l >= 100 && l < 108 && p >= 100 && p < 108);
        EXPECT_EQ(aClean[i] == 0, aInBox) << k << " " << l << " " << p;
        if (aInBox)
          continue;
        ++aOutside;
        if (aHoles[i] == 0)
          ++aRandomHoles;
        else
          EXPECT_EQ(aHoles[i], aClean[i]) << "no-data draws must not shift the speckle";
      }
    // Binomial count of random holes: 10% within five standard deviations.
    EXPECT_NEAR(aRandomHoles, 0.1 * aOutside, 5 * std::sqrt(aOutside * 0.1 * 0.9)) << k;
  }
  // A NaN null value marks no data with NaN.
  simulate({"series", "--out", file("q"), "--count", "1", "--lines", "16", "--pixels", "16", "--null", "NaN",
            "--nodata-box", "0,0,3,16"});
  tlrxExpectHeader(file("q_01"), "NullCellValue=nan");
  const std::vector<float> aCells = rawCells<float>(file("q_01"));
  for (size_t i = 0; i < aCells.size(); ++i)
    EXPECT_EQ(std::isnan(aCells[i]), i < 3 * 16) << i;
}

TEST_F(SimulateTest, SameSeedGivesIdenticalFilesAnotherSeedOthersAndByteOrderSwapsTheBytes) {
  for (const char *aRoot : {"r1", "r2", "r3"})
    simulate({"series", "--out", file(aRoot), "--count", "2", "--lines", "64", "--pixels", "64", "--seed",
              aRoot[1] == '3' ? "43" : "42", "--nodata-fraction", "0.05", "--change", "0,0,8,8,2,3"});
  for (const std::string aImage : {"_01", "_02"}) {
    EXPECT_EQ(tlrxReadFile(file("r1" + aImage)), tlrxReadFile(file("r2" + aImage)));
    EXPECT_EQ(tlrxReadFile(file("r1" + aImage + ".sml")), tlrxReadFile(file("r2" + aImage + ".sml")));
    EXPECT_NE(tlrxReadFile(file("r1" + aImage)), tlrxReadFile(file("r3" + aImage)));
  }
  EXPECT_NE(tlrxReadFile(file("r1_01")), tlrxReadFile(file("r1_02")));
  // Most significant byte first stores the swapped bytes of the same values.
  simulate({"series", "--out", file("le"), "--count", "1", "--lines", "8", "--pixels", "8"});
  simulate({"series", "--out", file("be"), "--count", "1", "--lines", "8", "--pixels", "8", "--byte-order", "MSBF"});
  tlrxExpectHeader(file("be_01"), "BytesOrder=MSBF");
  const std::string aLittle = tlrxReadFile(file("le_01")), aBig = tlrxReadFile(file("be_01"));
  ASSERT_EQ(aLittle.size(), aBig.size());
  for (size_t i = 0; i < aLittle.size(); ++i)
    EXPECT_EQ(aBig[i], aLittle[i - i % 4 + 3 - i % 4]) << i;
  EXPECT_EQ(tlrxReadTestRaster(file("be_01")), tlrxReadTestRaster(file("le_01")));
}

TEST_F(SimulateTest, PairIntensityCorrelationIsTheSquaredCoherence) {
  const struct {
    const char *mCoherence, *mLooks;
    double mCv;
  } aCases[] = {{"0", "1", 1.0}, {"0.7", "1", 1.0}, {"0.95", "1", 1.0}, {"0.8", "4", 0.5}};
  for (const auto &aCase : aCases) {
    SCOPED_TRACE(std::string(aCase.mCoherence) + " " + aCase.mLooks);
    const std::string aRoot = file(std::string("p") + aCase.mCoherence);
    simulate({"pair", "--out", aRoot, "--scene", "flat", "--coherence", aCase.mCoherence, "--looks", aCase.mLooks});
    const std::vector<double> aFirst = tlrxReadTestRaster(aRoot + "_1"), aSecond = tlrxReadTestRaster(aRoot + "_2");
    EXPECT_NEAR(correlation(aFirst, aSecond), std::pow(std::atof(aCase.mCoherence), 2), 0.02);
    EXPECT_NEAR(stats(aSecond).mMean, 1.0, 0.03);
    EXPECT_NEAR(stats(aFirst).cv(), aCase.mCv, 0.015);
    EXPECT_NEAR(stats(aSecond).cv(), aCase.mCv, 0.03);
    EXPECT_EQ(tlrxReadLines(aRoot + "_list.txt"), (std::vector<std::string>{aRoot + "_1", aRoot + "_2"}));
  }
  // A coherence ramp raises the correlation across columns.
  simulate({"pair", "--out", file("ramp"), "--scene", "flat", "--coherence-ramp", "0,1"});
  const std::vector<double> aFirst = tlrxReadTestRaster(file("ramp_1")), aSecond = tlrxReadTestRaster(file("ramp_2"));
  for (int aBand = 0; aBand < 4; ++aBand) {
    // Pooled over a band of columns the correlation is the mean of gamma^2.
    double aExpected = 0.0;
    for (int p = aBand * 64; p < aBand * 64 + 64; ++p)
      aExpected += std::pow(p / 255.0, 2) / 64.0;
    EXPECT_NEAR(correlation(box(aFirst, 256, 0, aBand * 64, 256, 64), box(aSecond, 256, 0, aBand * 64, 256, 64)),
                aExpected, 0.035)
        << aBand;
  }
}

TEST_F(SimulateTest, SlcPairCarriesThePhaseRampAndTheIntensitiesAndNoDataFollowsItsImage) {
  simulate({"pair", "--out", file("z"), "--scene", "flat", "--reflectivity", "3", "--coherence", "0.6", "--slc",
            "--phase-ramp", "0.01,0.03"});
  tlrxExpectHeader(file("z_slc_2"), "CellType=FLOAT_COMPLEX;DataUnits=SLC");
  const std::vector<std::complex<float>> aS1 = rawCells<std::complex<float>>(file("z_slc_1"));
  const std::vector<std::complex<float>> aS2 = rawCells<std::complex<float>>(file("z_slc_2"));
  const std::vector<double> aI1 = tlrxReadTestRaster(file("z_1")), aI2 = tlrxReadTestRaster(file("z_2"));
  ASSERT_EQ(aS1.size(), 256u * 256u);
  std::complex<double> aCross = 0.0;
  double aPower1 = 0.0, aPower2 = 0.0;
  for (size_t i = 0; i < aS1.size(); ++i) {
    const double aPhi = 2.0 * CTLRX_PI * (0.01 * (i / 256) + 0.03 * (i % 256));
    const std::complex<double> aZ1(aS1[i]), aZ2(aS2[i]);
    // Remove the expected phase: what remains has phase 0.
    aCross += aZ1 * std::conj(aZ2) * std::polar(1.0, -aPhi);
    aPower1 += std::norm(aZ1);
    aPower2 += std::norm(aZ2);
    EXPECT_NEAR(std::norm(aZ1), aI1[i], 1e-5 * (1.0 + aI1[i]));
    EXPECT_NEAR(std::norm(aZ2), aI2[i], 1e-5 * (1.0 + aI2[i]));
  }
  EXPECT_NEAR(std::arg(aCross), 0.0, 0.02);
  EXPECT_NEAR(std::abs(aCross) / std::sqrt(aPower1 * aPower2), 0.6, 0.01);
  EXPECT_NEAR(aPower1 / aS1.size(), 3.0, 0.06);
  // No-data boxes of a pair follow their image.
  simulate({"pair", "--out", file("pn"), "--lines", "16", "--pixels", "16", "--slc", "--null", "-5", "--nodata-box",
            "0,0,2,16", "--nodata-box", "10,0,1,16,2"});
  const std::vector<float> aFirst = rawCells<float>(file("pn_1")), aSecond = rawCells<float>(file("pn_2"));
  const std::vector<std::complex<float>> aSlc2 = rawCells<std::complex<float>>(file("pn_slc_2"));
  for (size_t i = 0; i < 256; ++i) {
    EXPECT_EQ(aFirst[i] == -5.0f, i / 16 < 2) << i;
    EXPECT_EQ(aSecond[i] == -5.0f, i / 16 < 2 || i / 16 == 10) << i;
    EXPECT_EQ(aSlc2[i] == std::complex<float>(-5.0f, -5.0f), i / 16 < 2 || i / 16 == 10) << i;
  }
}

TEST_F(SimulateTest, ConstantImagesHoldTheirValueExactlyAndExtremeSizesAreAccepted) {
  simulate({"constant", "--out", file("k"), "--value", "4", "--cell-type", "DOUBLE", "--lines", "3", "--pixels", "5",
            "--null", "-9999", "--nodata-box", "1,1,1,2", "--list", file("k.txt")});
  const double N = -9999;
  EXPECT_EQ(rawCells<double>(file("k")), std::vector<double>({4, 4, 4, 4, 4, 4, N, N, 4, 4, 4, 4, 4, 4, 4}));
  tlrxExpectHeader(file("k"), "DataUnits=NUMBER");
  EXPECT_EQ(tlrxReadLines(file("k.txt")), std::vector<std::string>{file("k")});
  simulate({"constant", "--out", file("kc"), "--value", "3,-4", "--cell-type", "FLOAT_COMPLEX", "--lines", "1",
            "--pixels", "1"});
  EXPECT_EQ(rawCells<std::complex<float>>(file("kc")), (std::vector<std::complex<float>>{{3.0f, -4.0f}}));
  EXPECT_EQ(tlrxReadTestRaster(file("kc")), std::vector<double>{25.0});
  EXPECT_FALSE(tlrxFileExists(file("kc_list.txt")));
  // The smallest and the largest sizes are accepted.
  simulate({"pair", "--out", file("one"), "--lines", "1", "--pixels", "1", "--coherence-ramp", "0.1,0.9"});
  EXPECT_EQ(tlrxReadFile(file("one_1")).size(), 4u);
  simulate({"series", "--out", file("wide"), "--count", "1", "--lines", "1", "--pixels", "900000", "--cell-type",
            "UNSIGNED_BYTE", "--scale-factor", "0.1"});
  EXPECT_EQ(tlrxReadFile(file("wide_01")).size(), 900000u);
}

TEST_F(SimulateTest, BadCommandLinesExitWithTwoTheMessageAndTheUsageLine) {
  const std::string aUsage =
      "usage: tlrx_simulate {series|pair|constant|slc} --out ROOT [options]  (tlrx_simulate --help for the options)\n";
  struct SCase {
    std::vector<std::string> mArgs;
    const char *mMessage;
  };
  const SCase aCases[] = {
      {{}, "missing command"},
      {{"mosaic"}, "unknown command 'mosaic' (series, pair, constant or slc)"},
      {{"series"}, "--out is required"},
      {{"--lines", "0"}, "option --lines: expected an integer in 1..900000, got '0'"},
      {{"--pixels", "900001"}, "option --pixels: expected an integer in 1..900000, got '900001'"},
      {{"--lines=12x"}, "option --lines: expected an integer in 1..900000, got '12x'"},
      {{"--lines"}, "option --lines needs a value N"},
      {{"--bogus", "1"}, "unknown option '--bogus'"},
      {{"--coherence", "0.5"}, "option --coherence does not apply to series"},
      {{"pair", "--out", "x", "--geographic=yes"}, "option --geographic takes no value"},
      {{"--cell-type", "SHORT", "--null", "NaN"},
       "option --null: SHORT cannot store nan; give a whole number in -32768..32767"},
      {{"--cell-type", "UNSIGNED_SHORT", "--null", "-1"},
       "option --null: UNSIGNED_SHORT cannot store -1; give a whole number in 0..65535"},
      {{"--cell-type", "BIT"}, "option --cell-type: BIT cannot hold image values; choose another type"},
      {{"--cell-type", "float"},
       "option --cell-type: expected a cell type name such as FLOAT or SHORT_COMPLEX, got 'float'"},
      {{"--change", "0,0,4,4,6,2"}, "option --change: image 6 does not exist (the run writes 5)"},
      {{"--change", "0,0,4,4,2"}, "option --change: expected L0,P0,NL,NP,K,F, got '0,0,4,4,2'"},
      {{"--count", "3", "--dates", "2020-01-01,2020-01-02"}, "option --dates: 2 dates for 3 images"},
      {{"--dates", "2020-01-01,2020-02-30"}, "option --dates: '2020-02-30': no such calendar date"},
      {{"--start", "1969-12-31"}, "option --start: '1969-12-31': the year must lie in 1970..2100"},
      {{"--start", "2100-12-01", "--interval", "31"},
       "option --interval: image 2 would be acquired after the year 2100"},
      {{"--image-origin", "2:1,2"},
       "--origin, --spacing, --image-origin and --image-spacing need --utm or --geographic"},
      {{"--utm", "61N"}, "option --utm: expected an integer in 1..60, got '61'"},
      {{"--utm", "32N", "--geographic"}, "give either --utm or --geographic, not both"},
      {{"--geographic", "--origin", "10,-89.9", "--spacing", "0.001"},
       "image 1 leaves the globe: latitudes must stay in -90..90 and longitudes in -180..360"},
      {{"--units", "AMPLITUDE", "--cell-type", "FLOAT_COMPLEX"},
       "option --units: complex cell types are written as SLC, not AMPLITUDE"},
      {{"--units", "COHERENCE"}, "option --units: series writes POWER or AMPLITUDE images, not COHERENCE"},
      {{"pair", "--out", "x", "--slc", "--looks", "2"}, "--slc writes single-look complex images and needs --looks 1"},
      {{"pair", "--out", "x", "--cell-type", "FLOAT_COMPLEX"},
       "pair writes real intensity or amplitude images; use --slc for the complex pair"},
      {{"pair", "--out", "x", "--coherence", "1.5"}, "option --coherence: expected a number in 0..1, got '1.5'"},
      {{"constant", "--out", "x"}, "constant needs --value"},
      {{"constant", "--out", "x.sml", "--value", "1"},
       "raster name 'x.sml' ends in '.sml', which names a header file; choose another --out"},
      {{"--seed", "-1"}, "option --seed: expected an integer in 0..18446744073709551615, got '-1'"},
      {{"--scale-factor", "0"}, "option --scale-factor: expected a positive number, got '0'"},
      {{"slc", "--out", "x", "--range-band-shift", "1"},
       "option --range-band-shift: expected a number in 0..1 (1 excluded), got '1'"},
      {{"slc", "--out", "x", "--range-band-shift", "0.3"},
       "option --range-band-shift: a shift of 0.3 needs a range band oversampling of at least 1.3, not 1.2"},
      {{"pair", "--out", "x", "--range-band-shift", "0.1"}, "option --range-band-shift does not apply to pair"},
  };
  for (const SCase &aCase : aCases) {
    std::vector<std::string> aArgs = aCase.mArgs;
    if (!aArgs.empty() && aArgs[0].rfind("--", 0) == 0) // options of a series
      aArgs.insert(aArgs.begin(), {"series", "--out", "x"});
    const STLRXRun aRun = run(aArgs);
    EXPECT_EQ(aRun.mExitStatus, 2) << aCase.mMessage;
    EXPECT_EQ(aRun.mOutput, "tlrx_simulate: " + std::string(aCase.mMessage) + "\n" + aUsage);
  }
  // Nothing was written by any refused command line (the runtime start-up of
  // this test leaves its own log only).
  for (const char *aName : {"x", "x_01", "x_1", "x_list.txt", "x.sml"})
    EXPECT_FALSE(tlrxFileExists(file(aName))) << aName;
}

TEST_F(SimulateTest, WriteFailuresAndMissingConfigurationExitWithOneClippingWarns) {
  STLRXRun aRun = run({"series", "--out", file("missing/dir/x"), "--count", "1", "--lines", "2", "--pixels", "2"});
  EXPECT_EQ(aRun.mExitStatus, 1);
  EXPECT_NE(aRun.mOutput.find("tlrx_simulate: error 261124 "), std::string::npos) << aRun.mOutput;
  EXPECT_NE(aRun.mOutput.find(file("missing/dir/x_01")), std::string::npos) << aRun.mOutput;
  const std::string aEmpty = file("empty_config");
  ASSERT_EQ(std::system(("mkdir -p '" + aEmpty + "'").c_str()), 0);
  aRun = tlrxRun("tlrx_simulate", {"constant", "--out", file("c"), "--value", "1"}, mDir.path(),
                 {{"TELLURIX_INIT_DIR", aEmpty}});
  EXPECT_EQ(aRun.mExitStatus, 1);
  EXPECT_EQ(aRun.mOutput, "tlrx_simulate: no configuration: " + aEmpty +
                              "/Tellurix_configuration.ini not found (set TELLURIX_INIT_DIR to the folder holding "
                              "Tellurix_configuration.ini)\n");
  EXPECT_FALSE(tlrxFileExists(file("c")));
  // Values beyond an integer type saturate (never wrap round) and are counted.
  const STLRXRun aClip = run({"series", "--out", file("b"), "--count", "1", "--lines", "64", "--pixels", "64",
                              "--scene", "flat", "--cell-type", "BYTE", "--scale-factor", "0.01"});
  ASSERT_EQ(aClip.mExitStatus, 0) << aClip.mOutput;
  const std::vector<int8_t> aCells = rawCells<int8_t>(file("b_01"));
  for (int8_t aCell : aCells)
    EXPECT_GT(aCell, 0);
  // P(I > 1.275) = exp(-1.275) for a unit exponential: about 28% of the cells.
  EXPECT_NEAR(std::count(aCells.begin(), aCells.end(), 127) / 4096.0, std::exp(-1.275), 0.03);
  EXPECT_TRUE(tlrxContains(aClip.mOutput, "tlrx_simulate: warning: ")) << aClip.mOutput;
  EXPECT_TRUE(tlrxContains(aClip.mOutput, " values of " + file("b_01") +
                                              " clipped to the range of BYTE (see --scale-factor)")) << aClip.mOutput;
}

} // namespace

// One reflectivity seen through each image's band: every image's spectrum is
// centred at its own Doppler centroid in azimuth (lag-one correlation phase)
// and at 0 in range, and master x conj(slave) has no azimuth fringe, a range
// fringe of F / osr and coherence g (1 - F) (1 - |dfDC| osr); centroids 0.45
// and -0.45 are 0.9 of the PRF apart and share nothing, although both bands
// cross the +-0.5 wrap.
TEST_F(SimulateTest, SlcPairSeesOneReflectivityThroughBandsMovedByTheDopplerAndTheRangeShift) {
  const struct {
    const char *mDoppler, *mShift, *mCoherence;
    double mMaster, mSlave, mExpected;
  } aCases[] = {{"0.1,0", "0", "1", 0.1, 0.0, 0.88},          {"0,0", "0.15", "1", 0.0, 0.0, 0.85},
                {"-0.05,0.05", "0.2", "0.7", -0.05, 0.05, 0.7 * 0.8 * 0.88}, {"0.45,-0.45", "0", "1", 0.45, -0.45, 0.0}};
  for (const auto &aCase : aCases) {
    SCOPED_TRACE(std::string(aCase.mDoppler) + " " + aCase.mShift);
    simulate({"slc", "--out", file("d"), "--lines", "256", "--pixels", "256", "--doppler", aCase.mDoppler,
              "--range-band-shift", aCase.mShift, "--coherence", aCase.mCoherence});
    const std::vector<std::complex<float>> aM = rawCells<std::complex<float>>(file("d_1"));
    const std::vector<std::complex<float>> aS = rawCells<std::complex<float>>(file("d_2"));
    ASSERT_EQ(aM.size(), 256u * 256u);
    const double aFringe = std::atof(aCase.mShift) / 1.2;
    std::complex<double> aCross = 0.0, aLag[2][2] = {{0.0, 0.0}, {0.0, 0.0}};
    double aPower1 = 0.0, aPower2 = 0.0;
    for (size_t i = 0; i < aM.size(); ++i) {
      const std::complex<double> m(aM[i]), s(aS[i]);
      aCross += m * std::conj(s) * std::polar(1.0, -2.0 * CTLRX_PI * aFringe * double(i % 256));
      aPower1 += std::norm(m);
      aPower2 += std::norm(s);
      if (i + 256 < aM.size()) {
        aLag[0][0] += std::complex<double>(aM[i + 256]) * std::conj(m);
        aLag[1][0] += std::complex<double>(aS[i + 256]) * std::conj(s);
      }
      if (i % 256 != 255) {
        aLag[0][1] += std::complex<double>(aM[i + 1]) * std::conj(m);
        aLag[1][1] += std::complex<double>(aS[i + 1]) * std::conj(s);
      }
    }
    EXPECT_NEAR(std::abs(aCross) / std::sqrt(aPower1 * aPower2), aCase.mExpected, 0.03);
    if (aCase.mExpected > 0.5)
      EXPECT_NEAR(std::arg(aCross), 0.0, 0.1);
    EXPECT_NEAR(std::arg(aLag[0][0]) / (2 * CTLRX_PI), aCase.mMaster, 0.01);
    EXPECT_NEAR(std::arg(aLag[1][0]) / (2 * CTLRX_PI), aCase.mSlave, 0.01);
    EXPECT_NEAR(std::arg(aLag[0][1]), 0.0, 0.05);
    EXPECT_NEAR(std::arg(aLag[1][1]), 0.0, 0.05);
  }
}
