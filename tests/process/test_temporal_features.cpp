// The temporal feature extraction command run as a host runs it: every
// feature against a direct computation on a seeded series with no data,
// the output headers, the geocoded grid, and the failures with their codes.
#include "tlrx_command_test_support.h"
#include "tlrx_description_xml.h"
#include "tlrx_temporal_test_support.h"


#include <algorithm>
#include <cmath>
#include <limits>
#include <random>
#include <sys/stat.h>

namespace {

constexpr double sNaN = std::numeric_limits<double>::quiet_NaN();
constexpr double sTolerance = 1.1754943508222875e-38;

const char *const sSuffixes[14] = {"_mea",  "_std",  "_med",  "_grad", "_max",  "_min",     "_spanD",
                                     "_maxI", "_maxD", "_spanR", "_maxR", "_minR", "_dateMax", "_dateMinBeforeMax"};
const char *const sSwitches[14] = {"mean",          "std",           "median",           "gradient",
                                     "max",           "min",           "span_max_less_min", "max_less_min_sup",
                                     "max_less_min_inf", "span_max_on_min", "max_on_min_sup", "max_on_min_inf",
                                     "date_max",      "date_min_before_max"};

// The features of one pixel computed the slow, obvious way: the kept
// samples, then sorted lists, then the modifiers.
struct SReference {
  double mValue[12];
  double mDate[2];
};

bool isNoData(double theValue, double theNull) {
  if (std::isnan(theNull))
    return std::isnan(theValue);
  return std::isnan(theValue) || (theNull - sTolerance <= theValue && theValue <= theNull + sTolerance);
}

SReference reference(const std::vector<double> &theSeries, const std::vector<double> &theNulls,
                     const std::vector<long> &theDays, double theN, double theRatioTime, bool theNormalize,
                     bool theDb) {
  SReference aRef;
  std::fill(aRef.mValue, aRef.mValue + 12, theN);
  aRef.mDate[0] = aRef.mDate[1] = -9999;
  std::vector<double> v;
  std::vector<long> d;
  for (size_t i = 0; i < theSeries.size(); ++i) {
    if (isNoData(theSeries[i], theNulls[i]))
      continue;
    const double a = std::fabs(theSeries[i]);
    if (!v.empty() && !((a / v.back()) / double(theDays[i] - (theDays[0] + d.back())) < theRatioTime))
      continue;
    v.push_back(a);
    d.push_back(theDays[i] - theDays[0]);
  }
  const size_t k = v.size();
  if (k == 0)
    return aRef;
  double aSum = 0, aCount = 0;
  for (double a : v)
    if (!isNoData(a, theN)) {
      aSum += a;
      ++aCount;
    }
  const double M = aCount > 0 ? aSum / aCount : theN;
  double aSquares = 0;
  for (double a : v)
    if (!isNoData(a, theN))
      aSquares += (a - M) * (a - M);
  std::vector<double> V = v, Dv, A, Rv;
  for (size_t j = 1; j < k; ++j) {
    Dv.push_back(v[j] - v[j - 1]);
    A.push_back(std::fabs(v[j] - v[j - 1]));
    Rv.push_back(v[j] / v[j - 1]);
  }
  for (auto *aList : {&V, &Dv, &A, &Rv})
    std::sort(aList->begin(), aList->end());
  double *r = aRef.mValue;
  bool aSet[12] = {};
  auto aPut = [&](int f, double x) {
    r[f] = x;
    aSet[f] = true;
  };
  aPut(0, M);
  aPut(2, k > 2 ? V[(k - 1) / 2] : k == 2 ? (V[0] + V[1]) / 2 : V[0]);
  aPut(4, V[k - 1]);
  aPut(5, V[0]);
  aPut(6, V[k - 1] - V[0]);
  aPut(9, V[k - 1] / V[0]);
  if (k > 1) {
    aPut(7, Dv[k - 2]);
    aPut(8, Dv[0]);
    aPut(10, Rv[k - 2]);
    aPut(11, Rv[0]);
    aPut(3, A[k - 2]);
    if (aCount > 0)
      aPut(1, std::sqrt(aSquares / aCount));
  }
  for (int f : {1, 3, 4, 5, 6, 7, 8, 9, 10, 11})
    if (theNormalize && aSet[f]) {
      if (aCount > 0) {
        r[f] /= M;
      } else {
        r[f] = theN;
        aSet[f] = false;
      }
    }
  for (int f = 1; f < 12; ++f)
    if (theDb && aSet[f])
      r[f] = 10 * std::log10(r[f]);
  size_t aMax = 0;
  for (size_t j = 1; j < k; ++j)
    if (v[j] > v[aMax])
      aMax = j;
  aRef.mDate[0] = double(d[aMax]);
  if (aMax > 0)
    aRef.mDate[1] = double(d[std::min_element(v.begin(), v.begin() + aMax) - v.begin()]);
  return aRef;
}

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

  std::vector<double> result(const char *theSuffix) const { return CommandTest::result(std::string("out") + theSuffix); }

  // No result, temporary grid header or list file left beside the root.
  void expectNothingWritten() {
    for (const char *aSuffix : sSuffixes)
      for (const char *aCompanion : {"", "_hdr", ".sml", ".hdr"})
        EXPECT_FALSE(tlrxFileExists(mDir.file(std::string("out") + aSuffix + aCompanion))) << aSuffix << aCompanion;
    for (const char *aCompanion : {"_hdr", ".sml", ".hdr", ".txt"})
      EXPECT_FALSE(tlrxFileExists(mDir.file(std::string("out") + aCompanion))) << aCompanion;
  }
};

// Value of the first "RasterInfo.OtherInfo" row whose key begins with theKey.
bool otherInfo(const CDescription &theHeader, const std::string &theKey, std::string &theValue) {
  const CDescriptionField &aTable = theHeader.getField("RasterInfo.OtherInfo");
  for (int32_t aRow = 0; aRow < aTable.getRowNbr(); ++aRow)
    if (aTable.isSet(aRow, 0) && std::string(aTable.getString(aRow, 0)).compare(0, theKey.size(), theKey) == 0) {
      theValue = aTable.getString(aRow, 1);
      return true;
    }
  return false;
}

void expectNear(double theActual, double theExpected, const std::string &theWhat) {
  const float aExpected = static_cast<float>(theExpected);
  if (std::isnan(aExpected)) {
    EXPECT_TRUE(std::isnan(theActual)) << theWhat;
  } else if (std::isinf(aExpected)) {
    EXPECT_EQ(theActual, aExpected) << theWhat;
  } else {
    EXPECT_NEAR(theActual, aExpected, 2e-6 * std::max(1.0, std::fabs(theExpected))) << theWhat;
  }
}

} // namespace

TEST_F(TemporalFeaturesTest, EveryFeatureMatchesADirectComputationOnASeededSeries) {
  // Six images of 7 x 9 pixels with speckle, zeros, negative values and no
  // data under three different null values; two acquisitions on one day.
  const int aLines = 7, aPixels = 9, aImages = 6;
  const std::vector<int> aDayOf = {30, 0, 12, 12, 47, 60};
  const std::vector<double> aNullOf = {-1, 0, sNaN, -1, -9999, 0};
  std::mt19937 aRandom(20240611);
  std::gamma_distribution<double> aSpeckle(1.0, 1.0);
  std::uniform_int_distribution<int> aDraw(0, 19);
  std::vector<std::vector<double>> aStack(aImages, std::vector<double>(aLines * aPixels));
  for (int i = 0; i < aImages; ++i) {
    for (double &v : aStack[i]) {
      const int aKind = aDraw(aRandom);
      v = aKind == 0 ? aNullOf[i] : aKind == 1 ? 0.0 : aKind == 2 ? -aSpeckle(aRandom) : 100 * aSpeckle(aRandom);
      v = static_cast<float>(v);
    }
    image("s" + std::to_string(i), aLines, aStack[i], tlrxAcquisitionText(aDayOf[i]),
          !(i == 1 || i == 5), aNullOf[i]);
  }
  // Temporal order: s1 (day 0), s2, s3 (day 12, listed order), s0, s4, s5.
  const std::vector<int> aOrder = {1, 2, 3, 0, 4, 5};
  const std::vector<std::string> aListed = {"s0", "s1", "s2", "s3", "s4", "s5"};
  struct SCase {
    bool mNormalize, mDb;
    const char *mIncrementDb, *mDecrementDays;
    double mRatioTime;
  } aCases[] = {{false, false, nullptr, nullptr, 1e100},
                {true, false, "3", "2", std::pow(10.0, 0.3) / 2},
                {true, true, "10", "0.5", 20},
                {false, true, "-4", "-1", 1e100}};
  for (const SCase &aCase : aCases) {
    STLRXTemporalParameters aParameters = parameters(aListed);
    aParameters.mSettings.push_back({"normalize", aCase.mNormalize ? "OK" : "NO"});
    aParameters.mSettings.push_back({"out_db", aCase.mDb ? "OK" : "ok"});
    if (aCase.mIncrementDb != nullptr)
      aParameters.mSettings.push_back({"max_increment_thr_db", aCase.mIncrementDb});
    if (aCase.mDecrementDays != nullptr)
      aParameters.mSettings.push_back({"max_decrement_thr_time", aCase.mDecrementDays});
    const STLRXRun aRun = run(aParameters);
    ASSERT_EQ(aRun.mExitStatus, 0) << aRun.mOutput << error();
    std::vector<std::vector<double>> aResults;
    for (const char *aSuffix : sSuffixes)
      aResults.push_back(result(aSuffix));
    std::vector<double> aNulls;
    std::vector<long> aDays;
    for (int i : aOrder) {
      aNulls.push_back(i == 1 || i == 5 ? 0.0 : aNullOf[i]);
      aDays.push_back(aDayOf[i]);
    }
    for (int p = 0; p < aLines * aPixels; ++p) {
      std::vector<double> aSeries;
      for (int i : aOrder)
        aSeries.push_back(aStack[i][p]);
      const SReference aRef = reference(aSeries, aNulls, aDays, -1, aCase.mRatioTime, aCase.mNormalize, aCase.mDb);
      for (int f = 0; f < 12; ++f)
        expectNear(aResults[f][p], aRef.mValue[f], std::string(sSuffixes[f]) + " pixel " + std::to_string(p));
      for (int f = 0; f < 2; ++f)
        EXPECT_EQ(aResults[12 + f][p], aRef.mDate[f]) << sSuffixes[12 + f] << " pixel " << p;
    }
  }
}

TEST_F(TemporalFeaturesTest, OutputHeadersCarryTheGridAndTheReferenceDate) {
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
  aParameters.mSettings = {{"max", "OK"}, {"date_max", "OK"}};
  const STLRXRun aRun = run(aParameters, "out.xml");
  ASSERT_EQ(aRun.mExitStatus, 0) << aRun.mOutput << error();

  CDescription aValue, aDate;
  fdfReadStandardHeader(mDir.file("out_max").c_str(), aValue);
  fdfReadStandardHeader(mDir.file("out_dateMax").c_str(), aDate);
  for (CDescription *aHeader : {&aValue, &aDate}) {
    EXPECT_EQ(aHeader->getField("RasterInfo.NrOfLinesPerImage").getInteger(), 2);
    EXPECT_EQ(aHeader->getField("RasterInfo.NrOfPixelsPerLine").getInteger(), 3);
    EXPECT_STREQ(aHeader->getField("RasterInfo.DataUnits").getString(), "NUMBER");
    EXPECT_FALSE(aHeader->getField("RasterInfo.CalibrationValue").holdsValue());
    EXPECT_FALSE(aHeader->getField("RasterInfo.CalibrationType").holdsValue());
    const CDescriptionField &aScale = aHeader->getField("RasterInfo.RealScaleFactor");
    EXPECT_TRUE(!aScale.holdsValue() || aScale.getDouble() == 1.0);
  }
  EXPECT_STREQ(aValue.getField("RasterInfo.CellType").getString(), "FLOAT");
  EXPECT_EQ(aValue.getField("RasterInfo.NullCellValue").getDouble(), -5);
  EXPECT_STREQ(aDate.getField("RasterInfo.CellType").getString(), "INT");
  EXPECT_EQ(aDate.getField("RasterInfo.NullCellValue").getDouble(), -9999);
  std::string aReference;
  ASSERT_TRUE(otherInfo(aDate, "REFERENCE TIME OF MULTITEMPORAL : ", aReference));
  EXPECT_EQ(aReference, tlrxAcquisitionText(5, 7));
  EXPECT_FALSE(otherInfo(aValue, "REFERENCE TIME", aReference));
  // Values read back as written: the input's scale factor is not carried over.
  EXPECT_EQ(result("_max"), std::vector<double>({2, 4, 6, 8, 10, 12}));
  EXPECT_EQ(result("_dateMax"), std::vector<double>({0, 35, 35, 35, 35, 35}));
  // Only the requested outputs exist; the grid header is gone, out.xml kept.
  EXPECT_FALSE(tlrxFileExists(mDir.file("out_mea")));
  EXPECT_FALSE(tlrxFileExists(mDir.file("out.sml")));
  EXPECT_FALSE(tlrxFileExists(mDir.file("out_hdr")));
  EXPECT_EQ(tlrxReadFile(mDir.file("out.xml")), tlrxTemporalParameterText(aParameters));
}

TEST_F(TemporalFeaturesTest, EveryParameterIsLoggedWithDefaultsApplied) {
  image("a", 1, {1, 2}, tlrxAcquisitionText(0));
  STLRXTemporalParameters aParameters = parameters({"a"}, false);
  aParameters.mSettings = {{"interp_type", "Bilinear_interpolation"}, {"max_increment_thr_db", "0"},
                           {"max_decrement_thr_time", "2.5"}, {"normalize", "TRUE"}, {"out_db", "OK"},
                           {"min", "OK"}, {"std", "ok"}, {"saturation_default", "0.25"}};
  const STLRXRun aRun = run(aParameters);
  ASSERT_EQ(aRun.mExitStatus, 0) << aRun.mOutput << error();
  const std::string aLog = log();
  for (const std::string &aLine : std::vector<std::string>{
           "MAIN PARAMETERS", "\n\n Input Slave List\n " + mDir.file("a") + "\n",
        // The text as read (it once logged the kernel it resolved to).
        "\nout_root_file_name: [" + mDir.file("out") + "]", "\ninterp_type: [Bilinear_interpolation]",
        "\nmax_increment_thr_db: [1000.000000]", "\nmax_decrement_thr_time: [2.500000]",
        "\nnormalize: [FALSE]", "\nOut Db: [TRUE]", "\nmean: [FALSE]",
        "\nstd: [FALSE]", "\nmin: [TRUE]", "\ndate_min_before_max: [FALSE]",
        "\nmake_tiff: [FALSE]", "\nsaturation_default: [0.250000]"})
    EXPECT_NE(aLog.find(aLine), std::string::npos) << aLine;
  EXPECT_NE(aLog.find("START :  Multitemporal Feature Extraction"), std::string::npos);
  // One sample each: min in decibels.
  const std::vector<double> aMin = result("_min");
  EXPECT_FLOAT_EQ(aMin[0], 0.0f);
  EXPECT_FLOAT_EQ(aMin[1], static_cast<float>(10 * std::log10(2.0)));
}

TEST_F(TemporalFeaturesTest, ParameterFileFailuresAreParameterErrors) {
  image("a", 1, {1, 2}, tlrxAcquisitionText(0));
  struct SCase {
    const char *mWhat;
    STLRXTemporalParameters mParameters;
    const char *mLogText;
  };
  std::vector<SCase> aCases;
  aCases.push_back({"empty list", parameters({}), "\nNeed at  least an input file: ["});
  aCases.push_back({"no list", parameters({"a"}), "\nNeed at  least an input file: ["});
  aCases.back().mParameters.mWithList = false;
  aCases.push_back({"environment", parameters({"a"}), "\nError occour during initialization XML input parameter: ["});
  aCases.back().mParameters.mEnvironment = "idl_envi_env";
  aCases.push_back({"root", parameters({"a"}), "\nError occour during initialization XML input parameter: ["});
  aCases.back().mParameters.mRootTag = "PARAMETERS";
  for (const SCase &aCase : aCases) {
    const STLRXRun aRun = run(aCase.mParameters);
    EXPECT_EQ(aRun.mExitStatus, 8) << aCase.mWhat;
    EXPECT_NE(error().find("[EC :456960]"), std::string::npos) << aCase.mWhat;
    EXPECT_NE(log().find(aCase.mLogText + mDir.file("param.xml") + "]"), std::string::npos) << aCase.mWhat;
    EXPECT_NE(log().find("[ERROR ID : 456960]"), std::string::npos) << aCase.mWhat;
    EXPECT_NE(log().find(mDir.file("param.xml") + " \n"), std::string::npos) << aCase.mWhat;
    expectNothingWritten();
  }
  // Settings without a default that the file lacks; the saturation is one
  // even without GeoTIFF copies (it once defaulted to 0).
  STLRXTemporalParameters aNoRoot = parameters({"a"});
  aNoRoot.mRoot.clear();
  STLRXTemporalParameters aNoSaturation = parameters({"a"});
  aNoSaturation.mSaturation.clear();
  const std::pair<STLRXTemporalParameters, const char *> aMissing[] = {
      {aNoRoot, "MAIN_CMD.out_root_file_name"}, {aNoSaturation, "MAIN_CMD.saturation_default"}};
  for (const auto &aCase : aMissing) {
    EXPECT_EQ(run(aCase.first).mExitStatus, 14) << aCase.second;
    EXPECT_NE(error().find("[EC :848642]"), std::string::npos) << aCase.second;
    EXPECT_NE(error().find(aCase.second), std::string::npos) << aCase.second;
    expectNothingWritten();
  }
}

TEST_F(TemporalFeaturesTest, BadInputsStopBeforeAnyResultAndLeaveNothingBehind) {
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
    expectNothingWritten();
  }
}

TEST_F(TemporalFeaturesTest, AnOutputThatCannotBeCreatedRemovesTheOnesBefore) {
  image("a", 1, {1, 2}, tlrxAcquisitionText(0));
  ASSERT_EQ(mkdir(mDir.file("out_min").c_str(), 0755), 0);
  STLRXTemporalParameters aParameters = parameters({"a"}, false);
  aParameters.mSettings = {{"mean", "OK"}, {"max", "OK"}, {"min", "OK"}};
  const STLRXRun aRun = run(aParameters);
  EXPECT_EQ(aRun.mExitStatus, 5);
  EXPECT_NE(error().find("[EC :261122]"), std::string::npos);
  EXPECT_NE(log().find(mDir.file("out_min") + " \n"), std::string::npos);
  for (const char *aName : {"out_mea", "out_mea.sml", "out_max", "out_max.sml", "out.sml"})
    EXPECT_FALSE(tlrxFileExists(mDir.file(aName))) << aName;
}

TEST_F(TemporalFeaturesTest, SimulatedSeriesMatchesTheDirectComputationWithRejections) {
  // Six dates listed out of order, two on one day (08:00 and 17:00), no data
  // scattered and in a band of image 3, a field brightening 5x from image 4.
  const STLRXRun aSim = tlrxRun("tlrx_simulate",
                                {"series", "--out", mDir.file("sim"), "--lines", "33", "--pixels", "47", "--dates",
                                 "2021-03-05,2021-01-10,2021-02-01T08:00,2021-02-01T17:00,2021-04-20,2021-06-01",
                                 "--null", "-9999", "--nodata-fraction", "0.1", "--nodata-box", "0,0,4,47,3",
                                 "--change", "10,10,8,8,4,5", "--seed", "11"},
                                mDir.path());
  ASSERT_EQ(aSim.mExitStatus, 0) << aSim.mOutput;
  const std::vector<std::string> aListed = {"sim_01", "sim_02", "sim_03", "sim_04", "sim_05", "sim_06"};
  const std::vector<int> aOrder = {1, 2, 3, 0, 4, 5};
  const std::vector<long> aDays = {0, 22, 22, 54, 100, 142};
  std::vector<std::vector<double>> aStack;
  for (const std::string &aName : aListed)
    aStack.push_back(tlrxReadTestRaster(mDir.file(aName)));
  const std::vector<double> aNulls(6, -9999);
  // Default thresholds, then 3 dB over 20 days: a ratio of 2 over 22 days
  // passes, 2.2 does not.
  for (const bool aStrict : {false, true}) {
    STLRXTemporalParameters aParameters = parameters(aListed);
    if (aStrict) {
      aParameters.mSettings.insert(aParameters.mSettings.end(),
                                   {{"max_increment_thr_db", "3"}, {"max_decrement_thr_time", "20"}, {"normalize", "OK"}});
    }
    const STLRXRun aRun = run(aParameters);
    ASSERT_EQ(aRun.mExitStatus, 0) << aRun.mOutput << error();
    std::vector<std::vector<double>> aResults;
    for (const char *aSuffix : sSuffixes)
      aResults.push_back(result(aSuffix));
    const double aRatioTime = aStrict ? std::pow(10.0, 0.3) / 20 : 1e100;
    int aRejecting = 0;
    for (size_t p = 0; p < aStack[0].size(); ++p) {
      std::vector<double> aSeries;
      for (int i : aOrder)
        aSeries.push_back(aStack[i][p]);
      const SReference aRef = reference(aSeries, aNulls, aDays, -9999, aRatioTime, aStrict, false);
      const SReference aAll = reference(aSeries, aNulls, aDays, -9999, 1e100, aStrict, false);
      aRejecting += aRef.mValue[0] != aAll.mValue[0];
      for (int f = 0; f < 12; ++f)
        expectNear(aResults[f][p], aRef.mValue[f], std::string(sSuffixes[f]) + " pixel " + std::to_string(p));
      for (int f = 0; f < 2; ++f)
        EXPECT_EQ(aResults[12 + f][p], aRef.mDate[f]) << sSuffixes[12 + f] << " pixel " << p;
    }
    if (aStrict) {
      EXPECT_GT(aRejecting, 100);
    }
  }
}

TEST_F(TemporalFeaturesTest, SimulatedGeocodedSeriesLandsCellForCell) {
  // UTM series: image 2 moved 2 cells east and 1 south, image 3 at 40 m
  // over half the cells. Union: E 600000..600640, N 5100000..5099580 at 20 m.
  const STLRXRun aSim = tlrxRun(
      "tlrx_simulate", {"series", "--out", mDir.file("geo"), "--count", "3", "--lines", "20", "--pixels", "30",
                        "--utm", "32N", "--origin", "600000,5100000", "--spacing", "20", "--image-origin",
                        "2:600040,5099980", "--image-spacing", "3:40", "--image-size", "3:10,15", "--null", "-9999",
                        "--nodata-fraction", "0.05", "--seed", "5"},
      mDir.path());
  ASSERT_EQ(aSim.mExitStatus, 0) << aSim.mOutput;
  STLRXTemporalParameters aParameters = parameters({"geo_03", "geo_01", "geo_02"});
  aParameters.mSettings.push_back({"interp_type", "nearest_neighbour"});
  const STLRXRun aRun = run(aParameters);
  ASSERT_EQ(aRun.mExitStatus, 0) << aRun.mOutput << error();
  CDescription aHeader;
  fdfReadStandardHeader(mDir.file("out_mea").c_str(), aHeader);
  ASSERT_EQ(aHeader.getField("RasterInfo.NrOfLinesPerImage").getInteger(), 21);
  ASSERT_EQ(aHeader.getField("RasterInfo.NrOfPixelsPerLine").getInteger(), 32);
  EXPECT_EQ(aHeader.getField("RegistrationCoordinates.LonEasting").getDouble(), 600000);
  EXPECT_EQ(aHeader.getField("RegistrationCoordinates.LatNorthing").getDouble(), 5100000);
  EXPECT_STREQ(aHeader.getField("CartographicSystem.State").getString(), "UTM-GLOBAL");
  struct SImage {
    const char *mName;
    double mEast0, mNorth0, mStep;
    int mLines, mPixels;
  } aImages[] = {{"geo_01", 600000, 5100000, 20, 20, 30},
                 {"geo_02", 600040, 5099980, 20, 20, 30},
                 {"geo_03", 600000, 5100000, 40, 10, 15}};
  std::vector<std::vector<double>> aData;
  for (const SImage &aImage : aImages)
    aData.push_back(tlrxReadTestRaster(mDir.file(aImage.mName)));
  std::vector<std::vector<double>> aResults;
  for (const char *aSuffix : sSuffixes)
    aResults.push_back(result(aSuffix));
  // Null of the first listed image (geo_03).
  const double n = -9999;
  for (int r = 0; r < 21; ++r)
    for (int c = 0; c < 32; ++c) {
      const double aE = 600000 + 20 * c + 10, aN = 5100000 - 20 * r - 10;
      std::vector<double> aSeries;
      for (int i = 0; i < 3; ++i) {
        const int l = static_cast<int>(std::floor((aImages[i].mNorth0 - aN) / aImages[i].mStep));
        const int p = static_cast<int>(std::floor((aE - aImages[i].mEast0) / aImages[i].mStep));
        const bool aInside = l >= 0 && l < aImages[i].mLines && p >= 0 && p < aImages[i].mPixels;
        aSeries.push_back(aInside ? aData[i][l * aImages[i].mPixels + p] : n);
      }
      const SReference aRef = reference(aSeries, {n, n, n}, {0, 12, 24}, n, 1e100, false, false);
      for (int f = 0; f < 12; ++f)
        expectNear(aResults[f][r * 32 + c], aRef.mValue[f], std::string(sSuffixes[f]) + " " + std::to_string(r) +
                                                                 "," + std::to_string(c));
      for (int f = 0; f < 2; ++f)
        EXPECT_EQ(aResults[12 + f][r * 32 + c], aRef.mDate[f]) << sSuffixes[12 + f] << " " << r << "," << c;
    }
}

TEST_F(TemporalFeaturesTest, GeoTiffCopiesOfValueAndDateOutputs) {
  std::vector<double> aRamp, aFlat(64, 3.0);
  for (int i = 0; i < 64; ++i)
    aRamp.push_back(1 + i);
  image("a", 8, aRamp, tlrxAcquisitionText(0));
  image("b", 8, aFlat, tlrxAcquisitionText(24));
  STLRXTemporalParameters aParameters = parameters({"a", "b"}, false);
  aParameters.mSettings = {{"mean", "OK"}, {"date_max", "OK"}, {"make_tiff", "OK"}, {"saturation_default", "0.5"}};
  const STLRXRun aRun = run(aParameters);
  ASSERT_EQ(aRun.mExitStatus, 0) << aRun.mOutput << error();
  for (const char *aName : {"out_mea.tif", "out_dateMax.tif"}) {
    const std::string aTiff = tlrxReadFile(mDir.file(aName));
    ASSERT_GT(aTiff.size(), 64u) << aName;
    EXPECT_TRUE(aTiff.compare(0, 4, "II*\0", 4) == 0 || aTiff.compare(0, 4, "MM\0*", 4) == 0) << aName;
  }
  EXPECT_TRUE(tlrxFileExists(mDir.file("out_mea.tif.sml")));
  EXPECT_FALSE(tlrxFileExists(mDir.file("out_std.tif")));
}
