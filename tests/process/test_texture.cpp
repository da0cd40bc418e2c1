// The texture command run as a host runs it: plans and argument vectors,
// simulated speckle, and every failure with its exit status and code.
#include "tlrx_command_test_support.h"

#include <cmath>

namespace {

class TextureCommandTest : public CommandTest {
protected:
  // in, out, dummy, rows, cols, unused, GeoTIFF switch, saturation.
  STLRXRun texture(const std::string &theInput, const std::string &theRows, const std::string &theCols,
                   const std::string &theTiff = "NO", bool theTracing = false) {
    return runCommand("main_texture#",
                      {file(theInput), file("out.img"), "0", theRows, theCols, "x", theTiff, "0"}, theTracing);
  }
  void constant(const std::string &theName, const std::string &theValue, int theLines = 8) {
    simulate({"constant", "--out", theName, "--value", theValue, "--units", "AMPLITUDE", "--lines",
              std::to_string(theLines), "--pixels", "10", "--null", "-1"});
  }
};

} // namespace

TEST_F(TextureCommandTest, SingleLookAmplitudeAndFourLookIntensitySpeckle) {
  const int aSize = 256, aWindow = 31;
  simulate({"series", "--out", "sl", "--count", "1", "--scene", "flat", "--units", "AMPLITUDE", "--lines",
            std::to_string(aSize), "--pixels", std::to_string(aSize), "--seed", "3"});
  ASSERT_EQ(texture("sl_01", "31", "31").mExitStatus, 0) << error();
  EXPECT_NEAR(tlrxInteriorMean(tlrxReadTestRaster(file("out.img")), aSize, aSize, aWindow / 2),
              std::sqrt(4.0 / M_PI - 1.0), 0.01);
  resetWorking();
  simulate({"series", "--out", "fl", "--count", "1", "--scene", "flat", "--looks", "4", "--lines",
            std::to_string(aSize), "--pixels", std::to_string(aSize), "--seed", "4"});
  ASSERT_EQ(texture("fl_01", "31", "31").mExitStatus, 0) << error();
  EXPECT_NEAR(tlrxInteriorMean(tlrxReadTestRaster(file("out.img")), aSize, aSize, aWindow / 2), 0.2536, 0.01);
  EXPECT_FALSE(tlrxFileExists(working())); // a clean run removes it
}

TEST_F(TextureCommandTest, TiffSwitchPlansTheConversionWithItsArguments) {
  constant("in.img", "5");
  texture("in.img", "5", "5", "OK", true);
  const std::string aTrace = trace();
  EXPECT_TRUE(tlrxContains(aTrace, "Step (0) texture\n"));
  const std::vector<std::string> aTextureArgs = {"aArgv[1] " + file("in.img"), "aArgv[2] " + file("out.img"),
                                                 "aArgv[3] 0", "aArgv[4] 5", "aArgv[5] 5"};
  for (const std::string &aArg : aTextureArgs)
    EXPECT_TRUE(tlrxContains(aTrace, aArg + "\n")) << aArg;
  EXPECT_TRUE(tlrxContains(aTrace, "Step (1) texture to tiff conversion\n"));
  const size_t aTiff = aTrace.find("Step (1) texture to tiff conversion\n");
  ASSERT_NE(aTiff, std::string::npos);
  const std::string aTiffPart = aTrace.substr(aTiff);
  EXPECT_EQ(tlrxTracedProcessName(aTiffPart), "texture to tiff conversion");
  const std::vector<std::string> aTiffArgs = {"aArgv[1] " + file("out.img"), "aArgv[2] " + file("out.img.tif"),
                                              "aArgv[3] 0", "aArgv[4] 1", "aArgv[5] 1"};
  for (const std::string &aArg : aTiffArgs)
    EXPECT_TRUE(tlrxContains(aTiffPart, aArg + "\n")) << aArg;
}

TEST_F(TextureCommandTest, LowerCaseOkOrNoRunsOnlyTheTexture) {
  constant("in.img", "5");
  for (const char *aSwitch : {"ok", "NO"}) {
    resetWorking();
    ASSERT_EQ(texture("in.img", "5", "5", aSwitch, true).mExitStatus, 0) << aSwitch;
    EXPECT_FALSE(tlrxContains(trace(), "Step (1)")) << aSwitch;
    EXPECT_FALSE(tlrxFileExists(file("out.img.tif"))) << aSwitch;
  }
  EXPECT_TRUE(tlrxContains(trace(), "TEXTURE TOTAL TIME (s): "));
}

TEST_F(TextureCommandTest, UnwritableResultHeader) {
  constant("in.img", "5");
  ASSERT_EQ(system(("mkdir '" + file("out.img.sml") + "'").c_str()), 0); // the header cannot be written
  expectFailure(texture("in.img", "3", "3"), 5, 261123, "out.img.sml");
}

// Guards the complex-cell fault: complex cells are read as re^2 + im^2, so an
// SLC image must be taken to amplitude like a "POWER" one (its texture would
// otherwise be that of the intensity, 1 instead of 0.5227).
TEST_F(TextureCommandTest, ComplexSingleLookImageIsTakenToAmplitude) {
  const int aSize = 256;
  simulate({"series", "--out", "slc", "--count", "1", "--scene", "flat", "--cell-type", "FLOAT_COMPLEX", "--lines",
            std::to_string(aSize), "--pixels", std::to_string(aSize), "--seed", "5"});
  ASSERT_EQ(texture("slc_01", "31", "31").mExitStatus, 0) << error();
  EXPECT_NEAR(tlrxInteriorMean(tlrxReadTestRaster(file("out.img")), aSize, aSize, 15), std::sqrt(4.0 / M_PI - 1.0),
              0.01);
}
