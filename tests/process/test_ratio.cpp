// The ratio command run as a host runs it, checked pixel by pixel against a
// direct computation.
#include "tlrx_command_test_support.h"
#include "tlrx_description_xml.h"
#include "tlrx_standard_header.h"

#include <cmath>
#include <limits>
#include <sys/stat.h>

namespace {

constexpr double sNaN = std::numeric_limits<double>::quiet_NaN();

class RatioTest : public CommandTest {
protected:
  // Lists theFiles and runs the ratio of them into theRoot.
  STLRXRun ratio(const std::vector<std::string> &theFiles, const std::string &theRoot, const std::string &theDb = "0",
                 const std::string &theTiff = "NO", bool theTracing = false) const {
    list(theFiles);
    return runCommand("main_ratio#", {file("list.txt"), file(theRoot), theDb, "unused", theTiff, "0.3"}, theTracing);
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

} // namespace

TEST_F(RatioTest, LinearAndDecibelRatiosMatchTheDirectFormula) {
  const std::vector<double> aA = {4, 0, 5, -7, 3, 8, 1, 2, 9, 6};
  const std::vector<double> aB = {2, 2, 0, 1, -1, 4, 3, 1e-39, 3, 5};
  image("a", aA, 2, "05-MAR-2004 09:30:15.500000", true, -7);
  image("b", aB, 2, "17-MAR-2004 09:30:15.500000", true, 3);
  for (const char *aDb : {"0", "1"}) {
    resetWorking();
    const STLRXRun aRun = ratio({"a", "b"}, "out", aDb);
    ASSERT_EQ(aRun.mExitStatus, 0) << aRun.mOutput << error();
    const std::vector<double> aGot = result("out_rto");
    ASSERT_EQ(aGot.size(), aA.size());
    for (size_t i = 0; i < aA.size(); ++i) {
      const double aWant = expectedRatio(aA[i], -7, aB[i], 3, aDb[0] == '1', -9999);
      if (std::isnan(aWant))
        EXPECT_TRUE(std::isnan(aGot[i])) << i;
      else
        EXPECT_FLOAT_EQ(aGot[i], aWant) << i;
    }
  }
  EXPECT_FALSE(tlrxFileExists(working())); // a clean run removes it
  EXPECT_FALSE(tlrxFileExists(file("out_rto.tif")));
}

TEST_F(RatioTest, ResultHeaderNamesItsInputsAndDates) {
  image("a", {1, 2, 3, 4}, 2, "05-MAR-2004 09:30:15.500000");
  image("b", {1, 2, 3, 4}, 2, "17-MAR-2004 10:00:00.000000");
  ASSERT_EQ(ratio({"a", "b"}, "out").mExitStatus, 0);
  CDescription aHeader;
  fdfReadStandardHeader(file("out_rto").c_str(), aHeader);
  EXPECT_STREQ(aHeader.getField("RasterInfo.CellType").getString(), "FLOAT");
  EXPECT_STREQ(aHeader.getField("RasterInfo.DataUnits").getString(), "RATIO");
  EXPECT_EQ(aHeader.getField("RasterInfo.NullCellValue").getDouble(), -9999.0);
  EXPECT_EQ(aHeader.getField("RasterInfo.FilesList").getNumberOfElements(), 2);
  EXPECT_EQ(std::string(aHeader.getField("RasterInfo.FilesList").getString(1)), file("b"));
  const std::string aXml = tlrxReadFile(file("out_rto.sml"));
  EXPECT_TRUE(tlrxContains(aXml, "MASTER ACQUISITION TIME"));
  EXPECT_TRUE(tlrxContains(aXml, "SLAVE ACQUISITION TIME"));
  EXPECT_TRUE(tlrxContains(aXml, "17-MAR-2004 10:00:00.000000"));
}

TEST_F(RatioTest, NaNNullsGiveTheNaNDummyValue) {
  tlrxWriteConfiguration(mDir.path(), {{14, "NaN"}});
  image("a", {sNaN, 1, 2, 3}, 2, "", true, sNaN);
  image("b", {1, 1, 1, 1}, 2, "", true, sNaN);
  list({"a", "b"});
  tlrxWriteFile(file("args.txt"), "ratio arguments\n" + file("list.txt") + "\n" + file("out") + "\n0\nunused\nNO\n0.3\n");
  ASSERT_EQ(tlrxRunMain("main_ratio#" + file("args.txt"), mDir.path(), {{"TELLURIX_INIT_DIR", mDir.path()}}).mExitStatus,
            0);
  const std::vector<double> aOut = result("out_rto");
  EXPECT_TRUE(std::isnan(aOut[0]));
  EXPECT_EQ(aOut[3], 3.0);
}

TEST_F(RatioTest, PairNamingForTwoAndThreeFiles) {
  for (const char *aName : {"a", "b", "c"})
    image(aName, {1, 2, 3, 4}, 2);
  ASSERT_EQ(ratio({"a", "b"}, "out_rto").mExitStatus, 0);
  EXPECT_TRUE(tlrxFileExists(file("out_rto")));
  EXPECT_FALSE(tlrxFileExists(file("out_rto_rto")));
  resetWorking();
  ASSERT_EQ(ratio({"a", "b", "c"}, "scene").mExitStatus, 0);
  EXPECT_TRUE(tlrxFileExists(file("scene_0_rto")));
  EXPECT_TRUE(tlrxFileExists(file("scene_1_rto.sml")));
  EXPECT_TRUE(tlrxFileExists(file("scene_1_rto.hdr")));
  EXPECT_FALSE(tlrxFileExists(file("scene_2_rto")));
}

TEST_F(RatioTest, LineCountMismatchWritesNothing) {
  image("a", std::vector<double>(1001, 1.0), 1001);
  image("b", std::vector<double>(1000, 1.0), 1000);
  expectFailure(ratio({"a", "b"}, "out"), 11, 652807);
  EXPECT_FALSE(tlrxFileExists(file("out_rto")));
  EXPECT_FALSE(tlrxFileExists(file("out_rto.sml")));
}

TEST_F(RatioTest, HostInterruptionStopsTheRun) {
  image("a", {1, 2, 3, 4}, 2);
  image("b", {1, 2, 3, 4}, 2);
  resetWorking("101");
  expectFailure(ratio({"a", "b"}, "out"), 6, 326400);
  EXPECT_EQ(tlrxReadLines(working())[0], "-1");
}

TEST_F(RatioTest, GeoTiffStepFollowsEveryRatioStep) {
  for (const char *aName : {"a", "b", "c"})
    image(aName, {1, 2, 3, 4, 5, 6, 7, 8}, 2);
  ASSERT_EQ(ratio({"a", "b", "c"}, "out", "0", "OK", true).mExitStatus, 0) << error();
  EXPECT_TRUE(tlrxFileExists(file("out_0_rto.tif")));
  EXPECT_TRUE(tlrxFileExists(file("out_1_rto.tif.sml")));
  const std::string aTrace = trace();
  const size_t aFirst = aTrace.find("Step (0) Ratio");
  const size_t aSecond = aTrace.find("Step (1) ratio to tiff conversion");
  const size_t aThird = aTrace.find("Step (2) Ratio");
  const size_t aFourth = aTrace.find("Step (3) ratio to tiff conversion");
  ASSERT_NE(aFourth, std::string::npos);
  EXPECT_TRUE(aFirst < aSecond && aSecond < aThird && aThird < aFourth);
  EXPECT_TRUE(tlrxContains(aTrace, "aArgv[2] " + file("out_1_rto.tif")));
  EXPECT_TRUE(tlrxContains(aTrace, "RATIO TOTAL TIME (s): "));
}

// Folder names in UTF-8 (whose bytes once went through the Latin-1 folding,
// 0x8C of "Č" turning into "<") and literal markers read back exactly.
TEST_F(RatioTest, NonAsciiAndMarkerFoldersReadBackExactly) {
  for (const std::string aFolder : {"\xC4\x8C" "echy", "\xE6\x97\xA5 ##amp&#x"}) {
    ASSERT_EQ(mkdir(file(aFolder).c_str(), 0755), 0) << aFolder;
    image(aFolder + "/a", {1, 2, 3, 4}, 2);
    image(aFolder + "/b", {1, 2, 3, 4}, 2);
    resetWorking();
    const STLRXRun aRun = ratio({aFolder + "/a", aFolder + "/b"}, aFolder + "/out");
    ASSERT_EQ(aRun.mExitStatus, 0) << aFolder << aRun.mOutput << error();
    CDescription aHeader;
    fdfReadStandardHeader(file(aFolder + "/out_rto").c_str(), aHeader);
    const CDescriptionField &aFiles = aHeader.getField("RasterInfo.FilesList");
    ASSERT_EQ(aFiles.getNumberOfElements(), 2);
    EXPECT_EQ(std::string(aFiles.getString(0)), file(aFolder + "/a"));
    EXPECT_EQ(std::string(aFiles.getString(1)), file(aFolder + "/b"));
  }
}

// A list file ending in a blank line still lists two files: one pair, named
// without a pair index.
TEST_F(RatioTest, BlankLinesOfTheListNameNoFile) {
  image("a", {1, 2, 3, 4}, 2);
  image("b", {1, 2, 3, 4}, 2);
  tlrxWriteFile(file("args.txt"), "ratio arguments\n" + file("list.txt") + "\n" + file("out") + "\n0\nunused\nNO\n0.3\n");
  tlrxWriteFile(file("list.txt"), "\n" + file("a") + "\n  \n" + file("b") + "\n\n");
  const STLRXRun aRun = tlrxRunMain("main_ratio#" + file("args.txt"), mDir.path());
  ASSERT_EQ(aRun.mExitStatus, 0) << aRun.mOutput << error();
  EXPECT_TRUE(tlrxFileExists(file("out_rto")));
  EXPECT_FALSE(tlrxFileExists(file("out_0_rto")));
}

// Number tokens are read whole: a bad decibel switch or saturation stops the
// run with a parameter error naming it, before anything is written.
TEST_F(RatioTest, BadNumberTokensAreParameterErrors) {
  image("a", {1, 2, 3, 4}, 2);
  image("b", {1, 2, 3, 4}, 2);
  list({"a", "b"});
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
    SCOPED_TRACE(aCase.mMessage);
    resetWorking();
    expectFailure(runCommand("main_ratio#", {file("list.txt"), file("out"), aCase.mDb, "unused", "OK", aCase.mSaturation}),
                  8, 456960, aCase.mMessage);
    EXPECT_FALSE(tlrxFileExists(file("out_rto")));
  }
}
