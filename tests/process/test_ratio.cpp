// The ratio command run as a host runs it: the null values and the decibel
// switch reach the line formula, pair naming, GeoTIFF steps and the number
// tokens.
#include "tlrx_header_expect.h"
#include "tlrx_command_test_support.h"

#include <cmath>
#include <limits>

namespace {

constexpr double sNaN = std::numeric_limits<double>::quiet_NaN();

class RatioTest : public CommandTest {
protected:
  // Lists theFiles and runs the ratio of them into theRoot.
  STLRXRun ratio(const std::vector<std::string> &theFiles, const std::string &theRoot, const std::string &theDb = "0",
                 const std::string &theTiff = "NO", bool theTracing = false) const {
    list(theFiles);
    resetWorking();
    return runCommand("main_ratio#", {file("list.txt"), file(theRoot), theDb, "unused", theTiff, "0.3"}, theTracing);
  }
};

} // namespace

// Each input's own null value (-7, 3), a non-positive or subnormal divisor
// and NaN with a numeric null; the line formula's cases are in its own test.
TEST_F(RatioTest, NullValuesAndTheDecibelSwitchReachTheLineFormula) {
  image("a", {4, 0, 5, -7, 3, 8, sNaN, 2, 3, 9}, 2, "05-MAR-2004 09:30:15.500000", true, -7);
  image("b", {2, 2, 0, 1, 4, 4, 1, 1e-39, -1, 3}, 2, "17-MAR-2004 10:00:00.000000", true, 3);
  const double N = -9999, aTwo = 10 * std::log10(2.0), aThreeQuarters = 10 * std::log10(0.75);
  const std::pair<const char *, std::vector<double>> aCases[] = {
      {"0", {2, 0, N, N, 0.75, 2, sNaN, N, N, N}}, {"1", {aTwo, -HUGE_VAL, N, N, aThreeQuarters, aTwo, sNaN, N, N, N}}};
  for (const auto &aCase : aCases) {
    ASSERT_EQ(ratio({"a", "b"}, "out", aCase.first).mExitStatus, 0) << error();
    const std::vector<double> aGot = result("out_rto");
    ASSERT_EQ(aGot.size(), aCase.second.size());
    for (size_t i = 0; i < aGot.size(); ++i)
      if (std::isnan(aCase.second[i]))
        EXPECT_TRUE(std::isnan(aGot[i])) << aCase.first << " " << i;
      else
        EXPECT_FLOAT_EQ(aGot[i], aCase.second[i]) << aCase.first << " " << i;
    EXPECT_FALSE(tlrxFileExists(working())); // a clean run removes it
    EXPECT_TRUE(tlrxContains(log(), "\n\nSUCCESSFUL\n\n"));
    EXPECT_FALSE(tlrxContains(log(), "[ERROR ID"));
  }
  EXPECT_FALSE(tlrxFileExists(file("out_rto.tif")));
  tlrxExpectHeader(file("out_rto"), "CellType=FLOAT;DataUnits=RATIO;NullCellValue=-9999;FilesList=" + file("a") + "," +
                                        file("b"));
  EXPECT_EQ(tlrxOtherInfo(file("out_rto"), "MASTER ACQUISITION TIME"), "05-MAR-2004 09:30:15.500000");
  EXPECT_EQ(tlrxOtherInfo(file("out_rto"), "SLAVE ACQUISITION TIME"), "17-MAR-2004 10:00:00.000000");
}

TEST_F(RatioTest, PairNamingGeoTiffStepsAndNumberTokens) {
  for (const char *aName : {"a", "b", "c"})
    image(aName, {1, 2, 3, 4}, 2);
  ASSERT_EQ(ratio({"a", "b"}, "out_rto").mExitStatus, 0);
  EXPECT_TRUE(tlrxFileExists(file("out_rto")));
  EXPECT_FALSE(tlrxFileExists(file("out_rto_rto")));
  ASSERT_EQ(ratio({"a", "b", "c"}, "out", "0", "OK", true).mExitStatus, 0) << error();
  for (const char *aName : {"out_0_rto", "out_1_rto.sml", "out_1_rto.hdr", "out_0_rto.tif", "out_1_rto.tif.sml"})
    EXPECT_TRUE(tlrxFileExists(file(aName))) << aName;
  EXPECT_FALSE(tlrxFileExists(file("out_2_rto")));
  const std::string aTrace = trace();
  const size_t aSteps[] = {aTrace.find("Step (0) Ratio"), aTrace.find("Step (1) ratio to tiff conversion"),
                           aTrace.find("Step (2) Ratio"), aTrace.find("Step (3) ratio to tiff conversion")};
  ASSERT_NE(aSteps[3], std::string::npos);
  EXPECT_TRUE(aSteps[0] < aSteps[1] && aSteps[1] < aSteps[2] && aSteps[2] < aSteps[3]);
  EXPECT_TRUE(tlrxContains(aTrace, "aArgv[2] " + file("out_1_rto.tif")));
  EXPECT_TRUE(tlrxContains(aTrace, "RATIO TOTAL TIME (s): "));
  // Number tokens are read whole: a bad decibel switch or saturation stops the
  // run with a parameter error naming it, before anything is written.
  list({"a", "b"});
  const struct {
    const char *mDb, *mSaturation, *mMessage;
  } aCases[] = {
      {"1x", "0.3", "decibel switch: not an integer [1x]"},
      {"0", "0.3x", "saturation: not a number [0.3x]"},
      {"0", "nan", "saturation: not a number [nan]"},
  };
  for (const auto &aCase : aCases) {
    SCOPED_TRACE(aCase.mMessage);
    resetWorking();
    const std::vector<std::string> aTokens = {file("list.txt"), file("bad"), aCase.mDb, "x", "OK", aCase.mSaturation};
    expectFailure(runCommand("main_ratio#", aTokens), 8, 456960, aCase.mMessage);
    EXPECT_FALSE(tlrxFileExists(file("bad_rto")));
  }
}

