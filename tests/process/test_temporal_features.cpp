// The temporal feature extraction command run as a host runs it: the order,
// null values and settings reaching the features, the output headers, the
// geocoded grid, and the failures with their codes.
#include "tlrx_header_expect.h"
#include "tlrx_command_test_support.h"
#include "tlrx_temporal_test_support.h"

#include <algorithm>
#include <array>
#include <functional>
#include <cmath>
#include <limits>
#include <sys/stat.h>

namespace {

constexpr double sNaN = std::numeric_limits<double>::quiet_NaN();

const char *const sSuffixes[14] = {"_mea",  "_std",  "_med",  "_grad", "_max",  "_min",     "_spanD",
                                     "_maxI", "_maxD", "_spanR", "_maxR", "_minR", "_dateMax", "_dateMinBeforeMax"};
const char *const sSwitches[14] = {"mean", "std", "median", "gradient", "max", "min", "span_max_less_min",
                                     "max_less_min_sup", "max_less_min_inf", "span_max_on_min", "max_on_min_sup",
                                     "max_on_min_inf", "date_max", "date_min_before_max"};

class TemporalFeaturesTest : public CommandTest {
protected:
  void image(const std::string &theName, int theLines, const std::vector<double> &theValues, const std::string &theTime,
             bool theHasNull = true, double theNull = -1) const {
    CommandTest::image(theName, theValues, theLines, theTime, theHasNull, theNull);
  }
  STLRXTemporalParameters parameters(const std::vector<std::string> &theInputs, bool theAll = true) {
    STLRXTemporalParameters aParameters;
    for (const std::string &aInput : theInputs)
      aParameters.mInputs.push_back(mDir.file(aInput));
    aParameters.mRoot = mDir.file("out");
    if (theAll)
      for (const char *aSwitch : sSwitches)
        aParameters.mSettings.push_back({aSwitch, "OK"});
    return aParameters;
  }
  STLRXRun run(const STLRXTemporalParameters &theParameters, const std::string &theFile = "param.xml") {
    tlrxWriteFile(mDir.file(theFile), tlrxTemporalParameterText(theParameters));
    resetWorking();
    return tlrxRunMain("main_temporal_feature_extraction#" + mDir.file(theFile), mDir.path());
  }
  std::vector<std::vector<double>> results() const {
    std::vector<std::vector<double>> aResults;
    for (const char *aSuffix : sSuffixes)
      aResults.push_back(result(std::string("out") + aSuffix));
    return aResults;
  }
  // No result, temporary grid header or list file left beside the root.
  void expectNothingWritten() {
    for (const char *aSuffix : sSuffixes)
      for (const char *aCompanion : {"", "_hdr", ".sml", ".hdr"})
        EXPECT_FALSE(tlrxFileExists(mDir.file(std::string("out") + aSuffix + aCompanion))) << aSuffix << aCompanion;
    for (const char *aCompanion : {"_hdr", ".sml", ".hdr", ".txt"})
      EXPECT_FALSE(tlrxFileExists(mDir.file(std::string("out") + aCompanion))) << aCompanion;
  }
};

// Every output at theIndex of theResults (in the order of sSuffixes) holds
// theWant as a float (the whole-day dates exactly).
void expectFeatures(const std::vector<std::vector<double>> &theResults, size_t theIndex,
                    const std::array<double, 14> &theWant) {
  for (int f = 0; f < 14; ++f) {
    const double aWant = static_cast<float>(theWant[f]);
    EXPECT_NEAR(theResults[f][theIndex], aWant, 2e-6 * std::max(1.0, std::fabs(aWant))) << sSuffixes[f] << theIndex;
  }
}

} // namespace

// What the command adds to the features, which are checked on the kernel:
// inputs listed out of order (the second of one day rejected), each with
// its own null value (none: 0; NaN), the first listed one's for the
// outputs, and the settings read and passed: normalisation, decibels and
// the rate limit of 3 dB over 2 days, which rejects 1 -> 100 over 12 days.
TEST_F(TemporalFeaturesTest, OrderNullValuesAndSettingsReachTheFeatures) {
  image("s0", 1, {40, -8, -1, 3}, tlrxAcquisitionText(30), true, -1);
  image("s1", 1, {10, 0, 0, 1}, tlrxAcquisitionText(0), false);
  image("s2", 1, {20, sNaN, sNaN, 100}, tlrxAcquisitionText(12), true, sNaN);
  image("s3", 1, {99, 5, -9999, 2}, tlrxAcquisitionText(12), true, -9999);
  const double N = -1, D = -9999;
  auto dB = [](double theValue) { return 10 * std::log10(theValue); };
  const std::array<double, 14> aNone = {N, N, N, N, N, N, N, N, N, N, N, N, D, D};
  const struct {
    std::vector<std::pair<std::string, std::string>> mSettings;
    std::vector<size_t> mPixels;
    std::vector<std::array<double, 14>> mWant;
  } aCases[] = {
      {{},
       {0, 1, 2, 3},
       {{70.0 / 3, std::sqrt(1400.0) / 3, 20, 20, 40, 10, 30, 20, 10, 4, 2, 2, 30, 0},
        {6.5, 1.5, 6.5, 3, 8, 5, 3, 3, 3, 1.6, 1.6, 1.6, 30, 12},
        aNone,
        {104.0 / 3, std::sqrt(19214.0) / 3, 3, 99, 100, 1, 99, 99, -97, 100, 100, 0.03, 12, 0}}},
      {{{"normalize", "OK"}, {"out_db", "OK"}, {"max_increment_thr_db", "3"}, {"max_decrement_thr_time", "2"}},
       {2, 3},
       {aNone,
        {2, dB(std::sqrt(2.0 / 3) / 2), dB(2), dB(0.5), dB(1.5), dB(0.5), dB(1), dB(0.5), dB(0.5), dB(1.5), dB(1),
         dB(0.75), 30, 0}}},
  };
  for (const auto &aCase : aCases) {
    STLRXTemporalParameters aParameters = parameters({"s0", "s1", "s2", "s3"});
    aParameters.mSettings.insert(aParameters.mSettings.end(), aCase.mSettings.begin(), aCase.mSettings.end());
    ASSERT_EQ(run(aParameters).mExitStatus, 0) << error();
    const std::vector<std::vector<double>> aResults = results();
    for (size_t i = 0; i < aCase.mPixels.size(); ++i)
      expectFeatures(aResults, aCase.mPixels[i], aCase.mWant[i]);
  }
}

TEST_F(TemporalFeaturesTest, OutputHeadersCarryTheGridAndTheReferenceDateAndGeoTiffCopiesFollow) {
  image("late", 2, {1, 2, 3, 4, 5, 6}, tlrxAcquisitionText(40), true, -5);
  image("early", 3, std::vector<double>(12, 2.0), tlrxAcquisitionText(5, 7), true, -1);
  // The first listed input carries calibration and a scale factor of 2.
  CDescription aLate;
  fdfReadStandardHeader(mDir.file("late").c_str(), aLate);
  aLate.getField("RasterInfo.CalibrationValue").setDouble(12.5);
  aLate.getField("RasterInfo.CalibrationType").setString("SIGMA0");
  aLate.getField("RasterInfo.RealScaleFactor").setDouble(2.0);
  fdfWriteStandardHeader(mDir.file("late").c_str(), aLate, true);
  // A file named after the root is not the command's to remove.
  tlrxWriteFile(mDir.file("out.xml"), "keep");
  STLRXTemporalParameters aParameters = parameters({"late", "early"}, false);
  aParameters.mSettings = {{"max", "OK"}, {"date_max", "OK"}, {"make_tiff", "OK"}, {"saturation_default", "0.5"}};
  ASSERT_EQ(run(aParameters, "out.xml").mExitStatus, 0) << error();
  for (const std::string aName : {"out_max", "out_dateMax"}) {
    tlrxExpectHeader(mDir.file(aName), "NrOfLinesPerImage=2;NrOfPixelsPerLine=3;DataUnits=NUMBER;CalibrationValue=;"
                                       "CalibrationType=;" +
                                           std::string(aName == "out_max" ? "CellType=FLOAT;NullCellValue=-5"
                                                                          : "CellType=INT;NullCellValue=-9999"));
    CDescription aHeader;
    fdfReadStandardHeader(mDir.file(aName).c_str(), aHeader);
    const CDescriptionField &aScale = aHeader.getField("RasterInfo.RealScaleFactor");
    EXPECT_TRUE(!aScale.holdsValue() || aScale.getDouble() == 1.0);
  }
  EXPECT_EQ(tlrxOtherInfo(mDir.file("out_dateMax"), "REFERENCE TIME OF MULTITEMPORAL : "), tlrxAcquisitionText(5, 7));
  EXPECT_EQ(tlrxOtherInfo(mDir.file("out_max"), "REFERENCE TIME"), "");
  // Values read back as written: the input's scale factor is not carried over.
  EXPECT_EQ(result("out_max"), std::vector<double>({2, 4, 6, 8, 10, 12}));
  EXPECT_EQ(result("out_dateMax"), std::vector<double>({0, 35, 35, 35, 35, 35}));
  // Only the requested outputs and their GeoTIFF copies exist; the grid
  // header is gone, out.xml kept.
  for (const char *aName : {"out_max.tif", "out_dateMax.tif"}) {
    const std::string aTiff = tlrxReadFile(mDir.file(aName));
    EXPECT_TRUE(aTiff.compare(0, 4, "II*\0", 4) == 0 || aTiff.compare(0, 4, "MM\0*", 4) == 0) << aName;
  }
  EXPECT_TRUE(tlrxFileExists(mDir.file("out_max.tif.sml")));
  for (const char *aName : {"out_mea.tif", "out_mea", "out.sml", "out_hdr"})
    EXPECT_FALSE(tlrxFileExists(mDir.file(aName))) << aName;
  EXPECT_EQ(tlrxReadFile(mDir.file("out.xml")), tlrxTemporalParameterText(aParameters));
}

TEST_F(TemporalFeaturesTest, EveryParameterIsLoggedWithDefaultsApplied) {
  image("a", 1, {1, 2}, tlrxAcquisitionText(0));
  STLRXTemporalParameters aParameters = parameters({"a"}, false);
  aParameters.mSettings = {{"interp_type", "Bilinear_interpolation"}, {"max_increment_thr_db", "0"},
                           {"max_decrement_thr_time", "2.5"}, {"normalize", "TRUE"}, {"out_db", "OK"},
                           {"min", "OK"}, {"std", "ok"}, {"saturation_default", "0.25"}};
  ASSERT_EQ(run(aParameters).mExitStatus, 0) << error();
  const std::string aLog = log();
  // The interpolation is logged as read (it once logged the kernel it
  // resolved to).
  for (const std::string &aLine : std::vector<std::string>{
           "START :  Multitemporal Feature Extraction", "MAIN PARAMETERS",
           "\n\n Input Slave List\n " + mDir.file("a") + "\n", "\nout_root_file_name: [" + mDir.file("out") + "]",
           "\ninterp_type: [Bilinear_interpolation]", "\nmax_increment_thr_db: [1000.000000]",
           "\nmax_decrement_thr_time: [2.500000]", "\nnormalize: [FALSE]", "\nOut Db: [TRUE]", "\nmean: [FALSE]",
           "\nstd: [FALSE]", "\nmin: [TRUE]", "\ndate_min_before_max: [FALSE]", "\nmake_tiff: [FALSE]",
           "\nsaturation_default: [0.250000]"})
    EXPECT_TRUE(tlrxContains(aLog, aLine)) << aLine;
  // One sample each: min in decibels.
  EXPECT_EQ(result("out_min"), std::vector<double>({0.0, static_cast<float>(10 * std::log10(2.0))}));
}

// A file the command cannot use is a parameter error naming it; a setting
// without a default that the file lacks is a missing field (the saturation
// is one even without GeoTIFF copies: it once defaulted to 0).
TEST_F(TemporalFeaturesTest, ParameterFileFailures) {
  image("a", 1, {1, 2}, tlrxAcquisitionText(0));
  auto aWith = [&](const std::function<void(STLRXTemporalParameters &)> &theChange) {
    STLRXTemporalParameters aParameters = parameters({"a"});
    theChange(aParameters);
    return aParameters;
  };
  const std::string aNeed = "\nNeed at  least an input file: [", aXml = "\nError occour during initialization XML "
                                                                        "input parameter: [";
  const struct {
    STLRXTemporalParameters mParameters;
    int mExit;
    std::string mText;
  } aCases[] = {
      {parameters({}), 8, aNeed},
      {aWith([](STLRXTemporalParameters &theP) { theP.mWithList = false; }), 8, aNeed},
      {aWith([](STLRXTemporalParameters &theP) { theP.mEnvironment = "idl_envi_env"; }), 8, aXml},
      {aWith([](STLRXTemporalParameters &theP) { theP.mRootTag = "PARAMETERS"; }), 8, aXml},
      {aWith([](STLRXTemporalParameters &theP) { theP.mRoot.clear(); }), 14, "MAIN_CMD.out_root_file_name"},
      {aWith([](STLRXTemporalParameters &theP) { theP.mSaturation.clear(); }), 14, "MAIN_CMD.saturation_default"},
  };
  for (const auto &aCase : aCases) {
    SCOPED_TRACE(aCase.mText);
    EXPECT_EQ(run(aCase.mParameters).mExitStatus, aCase.mExit);
    if (aCase.mExit == 8) {
      EXPECT_TRUE(tlrxNamesCode(error(), 456960));
      EXPECT_TRUE(tlrxContains(log(), aCase.mText + mDir.file("param.xml") + "]"));
      EXPECT_TRUE(tlrxContains(log(), "[ERROR ID : 456960]"));
      EXPECT_TRUE(tlrxContains(log(), mDir.file("param.xml") + " \n"));
    } else {
      EXPECT_TRUE(tlrxNamesCode(error(), 848642));
      EXPECT_TRUE(tlrxContains(error(), aCase.mText));
    }
    expectNothingWritten();
  }
}

TEST_F(TemporalFeaturesTest, BadInputsStopBeforeAnyResultAndAnOutputThatCannotBeCreatedRemovesTheOnesBefore) {
  image("a", 2, {1, 2, 3, 4}, tlrxAcquisitionText(0));
  image("b", 2, {1, 2, 3, 4}, tlrxAcquisitionText(12));
  image("geo", 2, {1, 2, 3, 4}, tlrxAcquisitionText(24));
  tlrxGeocodeTestRaster(mDir.file("geo"), 5000, 300, -10, 10);
  image("undated", 2, {1, 2, 3, 4}, "");
  image("baddate", 2, {1, 2, 3, 4}, "31-FOO-2020 10:00:00.000000");
  image("short", 2, {1, 2, 3, 4}, tlrxAcquisitionText(30));
  tlrxWriteFile(mDir.file("short"), "12345678");
  image("nodata", 2, {1, 2, 3, 4}, tlrxAcquisitionText(30));
  std::remove(mDir.file("nodata").c_str());
  struct SCase {
    std::vector<std::string> mInputs;
    int mExit;
    const char *mCode;
    std::string mMessage;
  } aCases[] = {
      {{"a", "geo"}, 5, "[EC :261124]", mDir.file("geo_hdr")},
      {{"geo", "b"}, 5, "[EC :261124]", mDir.file("b_hdr")},
      // A missing input is reported as missing (it used to read "cannot be written").
      {{"a", "missing"}, 5, "[EC :261122]", mDir.file("missing_hdr")},
      {{"a", "undated"}, 14, "[EC :848642]", "ACQUISITION TIME"},
      {{"baddate", "a"}, 14, "[EC :848642]", "ACQUISITION TIME"},
      {{"a", "nodata"}, 5, "[EC :261122]", mDir.file("nodata")},
      {{"short", "b"}, 5, "[EC :2611", mDir.file("short")},
  };
  for (const SCase &aCase : aCases) {
    const STLRXRun aRun = run(parameters(aCase.mInputs));
    const std::string aWhat = aCase.mInputs[0] + "," + aCase.mInputs[1];
    EXPECT_EQ(aRun.mExitStatus, aCase.mExit) << aWhat << aRun.mOutput;
    EXPECT_NE(error().find(aCase.mCode), std::string::npos) << aWhat << error();
    EXPECT_NE(log().find(aCase.mMessage + " \n"), std::string::npos) << aWhat;
    EXPECT_TRUE(aCase.mInputs[1] != "missing" || tlrxContains(error(), mDir.file("missing.sml"))) << error();
    expectNothingWritten();
  }
  // An output that cannot be created removes the ones before.
  ASSERT_EQ(mkdir(mDir.file("out_min").c_str(), 0755), 0);
  STLRXTemporalParameters aParameters = parameters({"a"}, false);
  aParameters.mSettings = {{"mean", "OK"}, {"max", "OK"}, {"min", "OK"}};
  EXPECT_EQ(run(aParameters).mExitStatus, 5);
  EXPECT_TRUE(tlrxNamesCode(error(), 261122));
  EXPECT_NE(log().find(mDir.file("out_min") + " \n"), std::string::npos);
  for (const char *aName : {"out_mea", "out_mea.sml", "out_max", "out_max.sml", "out.sml"})
    EXPECT_FALSE(tlrxFileExists(mDir.file(aName))) << aName;
}

// Geocoded inputs, the second a cell south and east of the first: the
// outputs cover the union grid, each cell the mean of the inputs over it.
TEST_F(TemporalFeaturesTest, GeocodedInputsLandCellForCellOnTheUnionGrid) {
  image("g1", 2, {1, 2, 3, 4}, tlrxAcquisitionText(0));
  image("g2", 2, {10, 20, 30, 40}, tlrxAcquisitionText(12));
  tlrxGeocodeTestRaster(mDir.file("g1"), 5000, 300, -10, 10);
  tlrxGeocodeTestRaster(mDir.file("g2"), 4990, 310, -10, 10);
  STLRXTemporalParameters aParameters = parameters({"g2", "g1"}, false);
  aParameters.mSettings = {{"mean", "OK"}, {"interp_type", "nearest_neighbour"}};
  ASSERT_EQ(run(aParameters).mExitStatus, 0) << error();
  tlrxExpectHeader(mDir.file("out_mea"), "NrOfLinesPerImage=3;NrOfPixelsPerLine=3;CartographicSystem.State=UTM-GLOBAL;"
                                        "RegistrationCoordinates.LonEasting=300;LatNorthing=5000");
  EXPECT_EQ(result("out_mea"), std::vector<double>({1, 2, -1, 3, 7, 20, -1, 30, 40}));
}
