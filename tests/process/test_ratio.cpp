// The ratio command run as a host runs it, checked pixel by pixel against a
// direct computation.
#include "tlrx_description_xml.h"
#include "tlrx_standard_header.h"
#include "tlrx_test_support.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <sys/stat.h>

namespace {

constexpr double sNaN = std::numeric_limits<double>::quiet_NaN();

class RatioTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override {
    tlrxStartLibraryEnvironment(mDir.path());
    tlrxWriteFile(working(), "0\nhost\n");
  }
  std::string working() const { return mDir.file("Process.working"); }
  std::string error() const { return tlrxReadFile(working() + "_error"); }

  // Writes the list of theFiles and an argument file; returns the command line.
  std::string arguments(const std::vector<std::string> &theFiles, const std::string &theRoot,
                        const std::string &theDb = "0", const std::string &theTiff = "NO") {
    std::string aList;
    for (const std::string &aFile : theFiles)
      aList += mDir.file(aFile) + "\n";
    tlrxWriteFile(mDir.file("list.txt"), aList);
    tlrxWriteFile(mDir.file("args.txt"), "ratio arguments\n" + mDir.file("list.txt") + "\n" + mDir.file(theRoot) +
                                             "\n" + theDb + "\nunused\n" + theTiff + "\n0.3\n");
    return "main_ratio#" + mDir.file("args.txt");
  }

  void image(const std::string &theName, const std::vector<double> &theValues, bool theHasNull, double theNull,
             const std::string &theTime = "", int theLines = 2) {
    STLRXTestRaster aRaster;
    aRaster.mLines = theLines;
    aRaster.mPixels = static_cast<int>(theValues.size()) / theLines;
    aRaster.mValues = theValues;
    aRaster.mHasNull = theHasNull;
    aRaster.mNull = theNull;
    aRaster.mAcquisitionTime = theTime;
    tlrxWriteTestRaster(mDir.file(theName), aRaster);
  }
};

// Direct formula: nulls, non-positive divisors, then a / b (or dB).
double expectedRatio(double theA, double theNullA, double theB, double theNullB, bool theDb, double theN) {
  auto aIsNull = [](double v, double d) {
    return std::isnan(d) ? std::isnan(v) : (v >= d - 1.1754943508222875e-38 && v <= d + 1.1754943508222875e-38);
  };
  if (aIsNull(theA, theNullA) || aIsNull(theB, theNullB) || theB <= 1.1754943508222875e-38)
    return theN;
  const double aRatio = theA / theB;
  return static_cast<float>(theDb ? 10 * std::log10(aRatio) : aRatio);
}

void expectSame(const std::vector<double> &theGot, const std::vector<double> &theWant) {
  ASSERT_EQ(theGot.size(), theWant.size());
  for (size_t i = 0; i < theGot.size(); ++i) {
    if (std::isnan(theWant[i]))
      EXPECT_TRUE(std::isnan(theGot[i])) << i;
    else
      EXPECT_FLOAT_EQ(theGot[i], theWant[i]) << i;
  }
}

} // namespace

TEST_F(RatioTest, LinearAndDecibelRatiosMatchTheDirectFormula) {
  const std::vector<double> aA = {4, 0, 5, -7, 3, 8, 1, 2, 9, 6};
  const std::vector<double> aB = {2, 2, 0, 1, -1, 4, 3, 1e-39, 3, 5};
  image("a", aA, true, -7, "05-MAR-2004 09:30:15.500000");
  image("b", aB, true, 3, "17-MAR-2004 09:30:15.500000");
  for (const char *aDb : {"0", "1"}) {
    tlrxWriteFile(working(), "0\nhost\n");
    const STLRXRun aRun = tlrxRunMain(arguments({"a", "b"}, "out", aDb), mDir.path());
    ASSERT_EQ(aRun.mExitStatus, 0) << aRun.mOutput << error();
    std::vector<double> aWant;
    for (size_t i = 0; i < aA.size(); ++i)
      aWant.push_back(expectedRatio(aA[i], -7, aB[i], 3, aDb[0] == '1', -9999));
    expectSame(tlrxReadTestRaster(mDir.file("out_rto")), aWant);
  }
  EXPECT_FALSE(tlrxFileExists(working())); // a clean run removes it
  EXPECT_FALSE(tlrxFileExists(mDir.file("out_rto.tif")));
}

TEST_F(RatioTest, FourOverTwoIsTwoOrThreeDecibels) {
  image("a", {4, 0}, false, 0, "", 1);
  image("b", {2, 2}, true, -1, "", 1);
  ASSERT_EQ(tlrxRunMain(arguments({"a", "b"}, "lin"), mDir.path()).mExitStatus, 0);
  tlrxWriteFile(working(), "0\nhost\n");
  ASSERT_EQ(tlrxRunMain(arguments({"a", "b"}, "db", "1"), mDir.path()).mExitStatus, 0);
  const std::vector<double> aLinear = tlrxReadTestRaster(mDir.file("lin_rto"));
  const std::vector<double> aDb = tlrxReadTestRaster(mDir.file("db_rto"));
  EXPECT_FLOAT_EQ(aLinear[0], 2.0f);
  EXPECT_NEAR(aDb[0], 3.0103, 1e-4);
  // No NullCellValue in input 1: exactly 0 is its null.
  EXPECT_EQ(aLinear[1], -9999.0);
}

TEST_F(RatioTest, ResultHeaderNamesItsInputsAndDates) {
  image("a", {1, 2, 3, 4}, true, -1, "05-MAR-2004 09:30:15.500000");
  image("b", {1, 2, 3, 4}, true, -1, "17-MAR-2004 10:00:00.000000");
  ASSERT_EQ(tlrxRunMain(arguments({"a", "b"}, "out"), mDir.path()).mExitStatus, 0);
  CDescription aHeader;
  fdfReadStandardHeader(mDir.file("out_rto").c_str(), aHeader);
  EXPECT_STREQ(aHeader.getField("RasterInfo.CellType").getString(), "FLOAT");
  EXPECT_STREQ(aHeader.getField("RasterInfo.DataUnits").getString(), "RATIO");
  EXPECT_EQ(aHeader.getField("RasterInfo.NullCellValue").getDouble(), -9999.0);
  EXPECT_EQ(aHeader.getField("RasterInfo.FilesList").getNumberOfElements(), 2);
  EXPECT_EQ(std::string(aHeader.getField("RasterInfo.FilesList").getString(1)), mDir.file("b"));
  const std::string aXml = tlrxReadFile(mDir.file("out_rto.sml"));
  EXPECT_NE(aXml.find("MASTER ACQUISITION TIME"), std::string::npos);
  EXPECT_NE(aXml.find("SLAVE ACQUISITION TIME"), std::string::npos);
  EXPECT_NE(aXml.find("17-MAR-2004 10:00:00.000000"), std::string::npos);
}

TEST_F(RatioTest, NaNNullsGiveTheNaNDummyValue) {
  const auto aEnv = std::map<std::string, std::string>{{"TELLURIX_INIT_DIR", mDir.path()}};
  tlrxWriteConfiguration(mDir.path(), {{14, "NaN"}});
  image("a", {sNaN, 1, 2, 3}, true, sNaN);
  image("b", {1, 1, 1, 1}, true, sNaN);
  ASSERT_EQ(tlrxRunMain(arguments({"a", "b"}, "out"), mDir.path(), aEnv).mExitStatus, 0);
  const std::vector<double> aOut = tlrxReadTestRaster(mDir.file("out_rto"));
  EXPECT_TRUE(std::isnan(aOut[0]));
  EXPECT_EQ(aOut[3], 3.0);
}

TEST_F(RatioTest, PairNamingForTwoAndThreeFiles) {
  for (const char *aName : {"a", "b", "c"})
    image(aName, {1, 2, 3, 4}, true, -1);
  ASSERT_EQ(tlrxRunMain(arguments({"a", "b"}, "out_rto"), mDir.path()).mExitStatus, 0);
  EXPECT_TRUE(tlrxFileExists(mDir.file("out_rto")));
  EXPECT_FALSE(tlrxFileExists(mDir.file("out_rto_rto")));
  tlrxWriteFile(working(), "0\nhost\n");
  ASSERT_EQ(tlrxRunMain(arguments({"a", "b", "c"}, "scene"), mDir.path()).mExitStatus, 0);
  EXPECT_TRUE(tlrxFileExists(mDir.file("scene_0_rto")));
  EXPECT_TRUE(tlrxFileExists(mDir.file("scene_1_rto.sml")));
  EXPECT_TRUE(tlrxFileExists(mDir.file("scene_1_rto.hdr")));
  EXPECT_FALSE(tlrxFileExists(mDir.file("scene_2_rto")));
}

TEST_F(RatioTest, LowerCaseOkMakesNoGeoTiff) {
  image("a", {1, 2, 3, 4}, true, -1);
  image("b", {1, 2, 3, 4}, true, -1);
  ASSERT_EQ(tlrxRunMain(arguments({"a", "b"}, "out", "0", "ok"), mDir.path()).mExitStatus, 0);
  EXPECT_FALSE(tlrxFileExists(mDir.file("out_rto.tif")));
}

TEST_F(RatioTest, TooFewTokensOrFilesAreParameterErrors) {
  tlrxWriteFile(mDir.file("short.txt"), "title\nlist\nroot\n0\n");
  STLRXRun aRun = tlrxRunMain("main_ratio#" + mDir.file("short.txt"), mDir.path());
  EXPECT_EQ(aRun.mExitStatus, 8);
  EXPECT_NE(error().find("[EC :456962]"), std::string::npos);
  image("a", {1, 2, 3, 4}, true, -1);
  tlrxWriteFile(working(), "0\nhost\n");
  aRun = tlrxRunMain(arguments({"a"}, "out"), mDir.path());
  EXPECT_EQ(aRun.mExitStatus, 8);
  EXPECT_NE(error().find("[EC :456962]"), std::string::npos);
  EXPECT_NE(error().find("list.txt"), std::string::npos);
}

TEST_F(RatioTest, LineCountMismatchWritesNothing) {
  STLRXTestRaster aTall;
  aTall.mLines = 1001;
  aTall.mPixels = 1;
  aTall.mValues.assign(1001, 1.0);
  tlrxWriteTestRaster(mDir.file("a"), aTall);
  aTall.mLines = 1000;
  aTall.mValues.assign(1000, 1.0);
  tlrxWriteTestRaster(mDir.file("b"), aTall);
  const STLRXRun aRun = tlrxRunMain(arguments({"a", "b"}, "out"), mDir.path());
  EXPECT_EQ(aRun.mExitStatus, 11);
  EXPECT_NE(error().find("[EC :652807]"), std::string::npos);
  EXPECT_FALSE(tlrxFileExists(mDir.file("out_rto")));
  EXPECT_FALSE(tlrxFileExists(mDir.file("out_rto.sml")));
}

TEST_F(RatioTest, MissingHeaderNamesTheHeaderFile) {
  image("a", {1, 2, 3, 4}, true, -1);
  tlrxWriteFile(mDir.file("b"), std::string(16, '\0'));
  const STLRXRun aRun = tlrxRunMain(arguments({"a", "b"}, "out"), mDir.path());
  EXPECT_EQ(aRun.mExitStatus, 5);
  EXPECT_NE(error().find("[EC :261122]"), std::string::npos);
  EXPECT_NE(error().find("b.sml"), std::string::npos);
}

TEST_F(RatioTest, HostInterruptionStopsTheRun) {
  image("a", {1, 2, 3, 4}, true, -1);
  image("b", {1, 2, 3, 4}, true, -1);
  const std::string aCommand = arguments({"a", "b"}, "out");
  tlrxWriteFile(working(), "101\nhost\n");
  const STLRXRun aRun = tlrxRunMain(aCommand, mDir.path());
  EXPECT_EQ(aRun.mExitStatus, 6);
  EXPECT_NE(error().find("[EC :326400]"), std::string::npos);
  EXPECT_EQ(tlrxReadLines(working())[0], "-1");
}

TEST_F(RatioTest, GeoTiffStepFollowsEveryRatioStep) {
  for (const char *aName : {"a", "b", "c"})
    image(aName, {1, 2, 3, 4, 5, 6, 7, 8}, true, -1, "", 2);
  tlrxWriteConfiguration(mDir.path(), {{12, "ACTIVE"}});
  const STLRXRun aRun = tlrxRunMain(arguments({"a", "b", "c"}, "out", "0", "OK"), mDir.path(),
                                    {{"TELLURIX_INIT_DIR", mDir.path()}});
  ASSERT_EQ(aRun.mExitStatus, 0) << error();
  EXPECT_TRUE(tlrxFileExists(mDir.file("out_0_rto.tif")));
  EXPECT_TRUE(tlrxFileExists(mDir.file("out_1_rto.tif.sml")));
  const std::string aTrace = tlrxReadFile(mDir.file("Process.trace"));
  const size_t aFirst = aTrace.find("Step (0) Ratio");
  const size_t aSecond = aTrace.find("Step (1) ratio to tiff conversion");
  const size_t aThird = aTrace.find("Step (2) Ratio");
  const size_t aFourth = aTrace.find("Step (3) ratio to tiff conversion");
  ASSERT_NE(aFourth, std::string::npos);
  EXPECT_TRUE(aFirst < aSecond && aSecond < aThird && aThird < aFourth);
  EXPECT_NE(aTrace.find("aArgv[2] " + mDir.file("out_1_rto.tif")), std::string::npos);
  EXPECT_NE(aTrace.find("RATIO TOTAL TIME (s): "), std::string::npos);
}

// Folder names in UTF-8 (whose bytes once went through the Latin-1 folding,
// 0x8C of "Č" turning into "<") and literal markers read back exactly.
TEST_F(RatioTest, NonAsciiAndMarkerFoldersReadBackExactly) {
  for (const std::string aFolder : {"\xC4\x8C" "echy", "\xE6\x97\xA5 ##amp&#x"}) {
    ASSERT_EQ(mkdir(mDir.file(aFolder).c_str(), 0755), 0) << aFolder;
    image(aFolder + "/a", {1, 2, 3, 4}, true, -1);
    image(aFolder + "/b", {1, 2, 3, 4}, true, -1);
    tlrxWriteFile(working(), "0\nhost\n");
    const STLRXRun aRun = tlrxRunMain(arguments({aFolder + "/a", aFolder + "/b"}, aFolder + "/out"), mDir.path());
    ASSERT_EQ(aRun.mExitStatus, 0) << aFolder << aRun.mOutput << error();
    CDescription aHeader;
    fdfReadStandardHeader(mDir.file(aFolder + "/out_rto").c_str(), aHeader);
    const CDescriptionField &aFiles = aHeader.getField("RasterInfo.FilesList");
    ASSERT_EQ(aFiles.getNumberOfElements(), 2);
    EXPECT_EQ(std::string(aFiles.getString(0)), mDir.file(aFolder + "/a"));
    EXPECT_EQ(std::string(aFiles.getString(1)), mDir.file(aFolder + "/b"));
  }
}

// A list file ending in a blank line still lists two files: one pair, named
// without a pair index.
TEST_F(RatioTest, BlankLinesOfTheListNameNoFile) {
  image("a", {1, 2, 3, 4}, true, -1);
  image("b", {1, 2, 3, 4}, true, -1);
  const std::string aCommand = arguments({"a", "b"}, "out");
  tlrxWriteFile(mDir.file("list.txt"), "\n" + mDir.file("a") + "\n  \n" + mDir.file("b") + "\n\n");
  const STLRXRun aRun = tlrxRunMain(aCommand, mDir.path());
  ASSERT_EQ(aRun.mExitStatus, 0) << aRun.mOutput << error();
  EXPECT_TRUE(tlrxFileExists(mDir.file("out_rto")));
  EXPECT_FALSE(tlrxFileExists(mDir.file("out_0_rto")));
}

// Number tokens are read whole: a bad decibel switch or saturation stops the
// run with a parameter error naming it, before anything is written.
TEST_F(RatioTest, BadNumberTokensAreParameterErrors) {
  image("a", {1, 2, 3, 4}, true, -1);
  image("b", {1, 2, 3, 4}, true, -1);
  const struct {
    const char *mDb;
    const char *mSaturation;
    const char *mMessage;
  } aCases[] = {
      {"1x", "0.3", "decibel switch: not an integer [1x]"},
      {"1.0", "0.3", "decibel switch: not an integer [1.0]"},
      {"0", "0.3x", "saturation: not a number [0.3x]"},
      {"0", "nan", "saturation: not a number [nan]"},
  };
  for (const auto &aCase : aCases) {
    arguments({"a", "b"}, "out");
    tlrxWriteFile(mDir.file("args.txt"), "ratio arguments\n" + mDir.file("list.txt") + "\n" + mDir.file("out") +
                                             "\n" + aCase.mDb + "\nunused\nOK\n" + aCase.mSaturation + "\n");
    tlrxWriteFile(working(), "0\nhost\n");
    const STLRXRun aRun = tlrxRunMain("main_ratio#" + mDir.file("args.txt"), mDir.path());
    EXPECT_EQ(aRun.mExitStatus, 8) << aCase.mMessage;
    EXPECT_NE(error().find("[EC :456960]"), std::string::npos) << error();
    EXPECT_NE(error().find(aCase.mMessage), std::string::npos) << error();
    EXPECT_FALSE(tlrxFileExists(mDir.file("out_rto")));
  }
}
