// The texture command run as a host runs it: simulated speckle, the plan and
// its argument vectors, and the unwritable result.
#include "tlrx_command_test_support.h"

#include <cmath>

namespace {

class TextureCommandTest : public CommandTest {
protected:
  // in, out, dummy, rows, cols, unused, GeoTIFF switch, saturation.
  STLRXRun texture(const std::string &theInput, const std::string &theWindow, const std::string &theTiff = "NO",
                   bool theTracing = false) {
    resetWorking();
    return runCommand("main_texture#", {file(theInput), file("out.img"), "0", theWindow, theWindow, "x", theTiff, "0"},
                      theTracing);
  }
};

} // namespace

// Speckle of 256 x 256 flat scenes in 31 x 31 windows. Guards the
// complex-cell fault: complex cells are read as re^2 + im^2, so an SLC image
// must be taken to amplitude like a "POWER" one (its texture would otherwise
// be that of the intensity, 1 instead of 0.5227).
TEST_F(TextureCommandTest, SingleLookAmplitudeFourLookIntensityAndSlcSpeckle) {
  const std::pair<std::vector<std::string>, double> aCases[] = {
      {{"--units", "AMPLITUDE", "--seed", "3"}, std::sqrt(4.0 / M_PI - 1.0)},
      {{"--looks", "4", "--seed", "4"}, 0.2536},
      {{"--cell-type", "FLOAT_COMPLEX", "--seed", "5"}, std::sqrt(4.0 / M_PI - 1.0)}};
  for (const auto &aCase : aCases) {
    std::vector<std::string> aArgs = {"series", "--out", "s", "--count", "1", "--scene", "flat"};
    aArgs.insert(aArgs.end(), aCase.first.begin(), aCase.first.end());
    simulate(aArgs);
    ASSERT_EQ(texture("s_01", "31").mExitStatus, 0) << error();
    EXPECT_NEAR(tlrxInteriorMean(result("out.img"), 256, 256, 15), aCase.second, 0.01) << aCase.first[0];
    EXPECT_FALSE(tlrxFileExists(working())); // a clean run removes it
  }
}

TEST_F(TextureCommandTest, TiffSwitchPlansTheConversionWithItsArgumentsOnlyWhenOk) {
  simulate({"constant", "--out", "in.img", "--value", "5", "--units", "AMPLITUDE", "--lines", "8", "--pixels", "10",
            "--null", "-1"});
  texture("in.img", "5", "OK", true);
  const std::string aTrace = trace();
  const size_t aTiff = aTrace.find("Step (1) texture to tiff conversion\n");
  ASSERT_NE(aTiff, std::string::npos);
  EXPECT_EQ(tlrxTracedProcessName(aTrace.substr(aTiff)), "texture to tiff conversion");
  const std::pair<std::string, std::vector<std::string>> aParts[] = {
      {aTrace, {"Step (0) texture", "aArgv[1] " + file("in.img"), "aArgv[2] " + file("out.img"), "aArgv[3] 0",
                "aArgv[4] 5", "aArgv[5] 5"}},
      {aTrace.substr(aTiff), {"aArgv[1] " + file("out.img"), "aArgv[2] " + file("out.img.tif"), "aArgv[3] 0",
                              "aArgv[4] 1", "aArgv[5] 1"}}};
  for (const auto &aPart : aParts)
    for (const std::string &aArg : aPart.second)
      EXPECT_TRUE(tlrxContains(aPart.first, aArg + "\n")) << aArg;
  for (const char *aSwitch : {"ok", "NO"}) {
    std::remove(file("out.img.tif").c_str());
    ASSERT_EQ(texture("in.img", "5", aSwitch, true).mExitStatus, 0) << aSwitch;
    EXPECT_FALSE(tlrxContains(trace(), "Step (1)")) << aSwitch;
    EXPECT_FALSE(tlrxFileExists(file("out.img.tif"))) << aSwitch;
    EXPECT_TRUE(tlrxContains(trace(), "TEXTURE TOTAL TIME (s): "));
  }
  // The header cannot be written.
  ASSERT_EQ(system(("rm -f '" + file("out.img.sml") + "' && mkdir '" + file("out.img.sml") + "'").c_str()), 0);
  expectFailure(texture("in.img", "3"), 5, 261123, "out.img.sml");
}
