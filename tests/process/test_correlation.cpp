// The correlation command run as a host runs it: simulated pairs of known
// coherence, the three-step plan and its argument vectors, the closing
// switch, the result header and every failure with its exit status and code.
#include "tlrx_description_xml.h"
#include "tlrx_standard_header.h"
#include "tlrx_command_test_support.h"

namespace {

class CorrelationCommandTest : public CommandTest {
protected:
  // Tokens: input 1, input 2, root, dummy, normalisation rows and columns,
  // correlation rows and columns, closing switch, GeoTIFF switch, saturation.
  std::vector<std::string> tokens(const std::string &theA, const std::string &theB,
                                  const std::string &theClose = "NO", const std::string &theTiff = "NO") const {
    return {file(theA), file(theB), file("coh"), "-5", "11", "11", "11", "11", theClose, theTiff, "0.3"};
  }
  STLRXRun correlation(const std::vector<std::string> &theTokens, bool theTracing = false) {
    return runCommand("main_correlation#", theTokens, theTracing);
  }
  void pair(const std::string &theRoot, const std::string &theCoherence, int theSize, const std::string &theSeed) {
    simulate({"pair", "--out", theRoot, "--scene", "flat", "--coherence", theCoherence, "--lines",
              std::to_string(theSize), "--pixels", std::to_string(theSize), "--seed", theSeed});
  }
};

} // namespace

TEST_F(CorrelationCommandTest, SimulatedPairsGiveTheirCoherence) {
  const int aSize = 200;
  for (const char *aCoherence : {"0.3", "0.6", "0.9"}) {
    resetWorking();
    pair("p", aCoherence, aSize, "9");
    const STLRXRun aRun = correlation(tokens("p_1", "p_2"));
    ASSERT_EQ(aRun.mExitStatus, 0) << aCoherence << error();
    // The estimate is |gamma| itself (see the correlation step).
    EXPECT_NEAR(tlrxInteriorMean(tlrxReadTestRaster(file("coh")), aSize, aSize, 5), std::stod(aCoherence), 0.05)
        << aCoherence;
  }
}

TEST_F(CorrelationCommandTest, IdenticalImagesGiveOneAndTheHeaderNamesThePair) {
  pair("p", "0.5", 40, "2");
  ASSERT_EQ(correlation(tokens("p_1", "p_1")).mExitStatus, 0) << error();
  for (double aValue : tlrxReadTestRaster(file("coh")))
    ASSERT_NEAR(aValue, 1.0, 1e-6);
  resetWorking();
  ASSERT_EQ(correlation(tokens("p_1", "p_2")).mExitStatus, 0) << error();
  CDescription aHeader;
  fdfReadStandardHeader(file("coh").c_str(), aHeader);
  EXPECT_STREQ(aHeader.getField("RasterInfo.DataUnits").getString(), "COHERENCE");
  EXPECT_STREQ(aHeader.getField("RasterInfo.CellType").getString(), "FLOAT");
  EXPECT_EQ(aHeader.getField("RasterInfo.NullCellValue").getDouble(), -9999.0);
  EXPECT_EQ(std::string(aHeader.getField("RasterInfo.FilesList").getString(1)), file("p_2"));
  const std::string aXml = tlrxReadFile(file("coh.sml"));
  EXPECT_TRUE(tlrxContains(aXml, "MASTER ACQUISITION TIME"));
  EXPECT_TRUE(tlrxContains(aXml, "SLAVE ACQUISITION TIME"));
  EXPECT_TRUE(tlrxContains(aXml, "13-JAN-2020 10:00:00.000000"));
  CDescription aNorm;
  fdfReadStandardHeader(file("coh_norm").c_str(), aNorm);
  EXPECT_EQ(aNorm.getField("RasterInfo.NullCellValue").getDouble(), -5.0);
}

TEST_F(CorrelationCommandTest, PlanAndArgumentVectorsOfTheThreeSteps) {
  pair("p", "0.5", 20, "2");
  std::vector<std::string> aTokens = tokens("p_1", "p_2", "NO", "OK");
  aTokens[4] = "3";
  aTokens[5] = "5";
  aTokens[6] = "7";
  aTokens[7] = "9";
  correlation(aTokens, true);
  const std::string aTrace = trace();
  const std::string aA = file("p_1"), aB = file("p_2"), aRoot = file("coh");
  const std::vector<std::pair<std::string, std::vector<std::string>>> aSteps = {
      {"Step (0) normalize_images\n",
       {"aArgv[1] " + aA, "aArgv[2] " + aB, "aArgv[3] " + aRoot + "_norm",
        "aArgv[4] -5", "aArgv[5] 3", "aArgv[6] 5"}},
      {"Step (1) quick_and_dirty\n",
       {"aArgv[1] " + aA, "aArgv[2] " + aB, "aArgv[3] " + aRoot + "_norm",
        "aArgv[4] " + aRoot, "aArgv[5] -5", "aArgv[6] 7", "aArgv[7] 9"}},
      {"Step (2) Out File to tiff conversion\n",
       {"aArgv[1] " + aRoot, "aArgv[2] " + aRoot + ".tif",
        "aArgv[3] 0.3", "aArgv[4] 1", "aArgv[5] 1"}},
  };
  for (size_t s = 0; s < aSteps.size(); ++s) {
    const size_t aStart = aTrace.find(aSteps[s].first);
    ASSERT_NE(aStart, std::string::npos) << aSteps[s].first;
    const size_t aEnd = s + 1 < aSteps.size() ? aTrace.find(aSteps[s + 1].first) : std::string::npos;
    const std::string aPart = aTrace.substr(aStart, aEnd == std::string::npos ? std::string::npos : aEnd - aStart);
    for (const std::string &aArg : aSteps[s].second)
      EXPECT_TRUE(tlrxContains(aPart, aArg + "\n")) << aArg;
    // Element 0 is the process name, that is the step's name.
    const std::string aName = aSteps[s].first.substr(9, aSteps[s].first.size() - 10);
    EXPECT_EQ(tlrxTracedProcessName(aPart), aName);
  }
  for (int i = 0; i < 11; ++i)
    EXPECT_TRUE(tlrxContains(aTrace, " argv[" + std::to_string(i) + "] = " + aTokens[i] + "\n")) << i;
}

TEST_F(CorrelationCommandTest, TiffSwitchOnMakesTheGeoTiffOfTheCoherence) {
  pair("p", "0.5", 20, "2");
  ASSERT_EQ(correlation(tokens("p_1", "p_2", "NO", "OK")).mExitStatus, 0) << error();
  EXPECT_TRUE(tlrxFileExists(file("coh.tif")));
  EXPECT_FALSE(tlrxFileExists(file("coh_norm.tif")));
}

TEST_F(CorrelationCommandTest, ClosingSwitchRemovesTheNormalisationImageOnlyWhenOk) {
  pair("p", "0.5", 20, "2");
  for (const char *aSwitch : {"ok", "NO"}) {
    resetWorking();
    ASSERT_EQ(correlation(tokens("p_1", "p_2", aSwitch)).mExitStatus, 0) << error();
    EXPECT_TRUE(tlrxFileExists(file("coh_norm"))) << aSwitch;
    EXPECT_TRUE(tlrxFileExists(file("coh_norm.sml"))) << aSwitch;
  }
  resetWorking();
  ASSERT_EQ(correlation(tokens("p_1", "p_2", "OK"), true).mExitStatus, 0) << error();
  EXPECT_FALSE(tlrxFileExists(file("coh_norm")));
  EXPECT_FALSE(tlrxFileExists(file("coh_norm.sml")));
  EXPECT_FALSE(tlrxFileExists(file("coh_norm.hdr")));
  EXPECT_TRUE(tlrxFileExists(file("coh")));
  EXPECT_TRUE(tlrxContains(trace(), "\nSHUT"));
}

// Guards the complex-cell fault: complex cells already read as intensities
// and must not be squared again.
TEST_F(CorrelationCommandTest, ComplexPairIsReadAsIntensities) {
  const int aSize = 200;
  simulate({"pair", "--out", "c", "--scene", "flat", "--coherence", "0.6", "--slc", "--lines",
            std::to_string(aSize), "--pixels", std::to_string(aSize), "--seed", "6"});
  ASSERT_EQ(correlation(tokens("c_slc_1", "c_slc_2")).mExitStatus, 0) << error();
  EXPECT_NEAR(tlrxInteriorMean(tlrxReadTestRaster(file("coh")), aSize, aSize, 5), 0.6, 0.05);
}
