// The correlation command run as a host runs it: simulated pairs of known
// coherence, the three-step plan and its argument vectors and the closing
// switch. Headers and errors of the steps are in the step tests.
#include "tlrx_command_test_support.h"

namespace {

class CorrelationCommandTest : public CommandTest {
protected:
  // Tokens: input 1, input 2, root, dummy, normalisation rows and columns,
  // correlation rows and columns, closing switch, GeoTIFF switch, saturation.
  STLRXRun correlation(const std::string &theA, const std::string &theB, const std::string &theClose = "NO",
                       bool theTracing = false) {
    resetWorking();
    return runCommand("main_correlation#",
                      {file(theA), file(theB), file("coh"), "-5", "11", "11", "11", "11", theClose, "NO", "0.3"},
                      theTracing);
  }
  void pair(const std::string &theCoherence, int theSize, const std::string &theSeed, bool theSlc = false) {
    std::vector<std::string> aArgs = {"pair", "--out", "p", "--scene", "flat", "--coherence", theCoherence, "--lines",
                                      std::to_string(theSize), "--pixels", std::to_string(theSize), "--seed", theSeed};
    if (theSlc)
      aArgs.push_back("--slc");
    simulate(aArgs);
  }
};

} // namespace

// The estimate is |gamma| itself. Guards the complex-cell fault: complex
// cells already read as intensities and must not be squared again.
TEST_F(CorrelationCommandTest, SimulatedPairsGiveTheirCoherence) {
  for (const char *aCoherence : {"0.3", "0.6", "0.9", "slc 0.6"}) {
    const bool aSlc = aCoherence[0] == 's';
    pair(aSlc ? "0.6" : aCoherence, 200, aSlc ? "6" : "9", aSlc);
    const std::string aPrefix = aSlc ? "p_slc_" : "p_";
    ASSERT_EQ(correlation(aPrefix + "1", aPrefix + "2").mExitStatus, 0) << aCoherence << error();
    EXPECT_NEAR(tlrxInteriorMean(result("coh"), 200, 200, 5), aSlc ? 0.6 : std::stod(aCoherence), 0.05) << aCoherence;
  }
}

TEST_F(CorrelationCommandTest, PlanArgumentVectorsOfTheThreeStepsAndTheClosingSwitch) {
  pair("0.5", 20, "2");
  std::vector<std::string> aTokens = {file("p_1"), file("p_2"), file("coh"), "-5", "3", "5", "7", "9", "NO", "OK",
                                      "0.3"};
  ASSERT_EQ(runCommand("main_correlation#", aTokens, true).mExitStatus, 0) << error();
  const std::string aTrace = trace();
  const std::string aA = file("p_1"), aB = file("p_2"), aRoot = file("coh");
  const std::vector<std::pair<std::string, std::vector<std::string>>> aSteps = {
      {"Step (0) normalize_images\n",
       {"aArgv[1] " + aA, "aArgv[2] " + aB, "aArgv[3] " + aRoot + "_norm", "aArgv[4] -5", "aArgv[5] 3", "aArgv[6] 5"}},
      {"Step (1) quick_and_dirty\n",
       {"aArgv[1] " + aA, "aArgv[2] " + aB, "aArgv[3] " + aRoot + "_norm", "aArgv[4] " + aRoot, "aArgv[5] -5",
        "aArgv[6] 7", "aArgv[7] 9"}},
      {"Step (2) Out File to tiff conversion\n",
       {"aArgv[1] " + aRoot, "aArgv[2] " + aRoot + ".tif", "aArgv[3] 0.3", "aArgv[4] 1", "aArgv[5] 1"}},
  };
  for (size_t s = 0; s < aSteps.size(); ++s) {
    const size_t aStart = aTrace.find(aSteps[s].first);
    ASSERT_NE(aStart, std::string::npos) << aSteps[s].first;
    const size_t aEnd = s + 1 < aSteps.size() ? aTrace.find(aSteps[s + 1].first) : std::string::npos;
    const std::string aPart = aTrace.substr(aStart, aEnd == std::string::npos ? std::string::npos : aEnd - aStart);
    for (const std::string &aArg : aSteps[s].second)
      EXPECT_TRUE(tlrxContains(aPart, aArg + "\n")) << aArg;
    // Element 0 is the process name, that is the step's name.
    EXPECT_EQ(tlrxTracedProcessName(aPart), aSteps[s].first.substr(9, aSteps[s].first.size() - 10));
  }
  for (int i = 0; i < 11; ++i)
    EXPECT_TRUE(tlrxContains(aTrace, " argv[" + std::to_string(i) + "] = " + aTokens[i] + "\n")) << i;
  EXPECT_TRUE(tlrxFileExists(file("coh.tif")));
  EXPECT_FALSE(tlrxFileExists(file("coh_norm.tif")));
  // The closing switch removes the normalisation image only when "OK".
  for (const char *aSwitch : {"ok", "NO", "OK"}) {
    ASSERT_EQ(correlation("p_1", "p_2", aSwitch, true).mExitStatus, 0) << error();
    for (const char *aName : {"coh_norm", "coh_norm.sml"})
      EXPECT_EQ(tlrxFileExists(file(aName)), aSwitch[0] != 'O') << aSwitch << " " << aName;
    EXPECT_EQ(tlrxContains(trace(), "\nSHUT"), aSwitch[0] == 'O') << aSwitch;
  }
  EXPECT_FALSE(tlrxFileExists(file("coh_norm.hdr")));
  EXPECT_TRUE(tlrxFileExists(file("coh")));
}

