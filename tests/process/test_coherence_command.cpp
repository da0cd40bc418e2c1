// The coherence command through the built program: simulated pairs with the
// simulator's parameter file, the plan and argument vectors read back from
// the trace, the closing operations, the failures, and the coherence of the
// whole chain against Touzi's expectation.
#include "tlrx_command_test_support.h"
#include "tlrx_slc_test_support.h"

#include "tlrx_generic_utility.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <regex>

namespace {

// Touzi's expectation of the sample coherence of N independent samples at
// true coherence g: Gamma(N) Gamma(3/2) / Gamma(N + 1/2) (1 - g^2)^N
// 3F2(3/2, N, N; N + 1/2, 1; g^2), the series summed term by term.
double touzi(double theG, int theN) {
  const double x = theG * theG, n = theN;
  double aTerm = 1.0, aSum = 1.0;
  for (int k = 0; k < 20000 && aTerm > 1e-16 * aSum; ++k) {
    aTerm *= (1.5 + k) * (n + k) * (n + k) / ((n + 0.5 + k) * (1.0 + k) * (1.0 + k)) * x;
    aSum += aTerm;
  }
  const double aLog = std::lgamma(n) + std::lgamma(1.5) - std::lgamma(n + 0.5) + n * std::log1p(-x);
  return std::exp(aLog + std::log(aSum));
}

// One step as the trace shows it: its name and argv[1..].
struct SStepTrace {
  std::string mName;
  std::vector<std::string> mArgs;
};

std::vector<SStepTrace> tracedSteps(const std::string &theTrace) {
  std::vector<SStepTrace> aSteps;
  const std::regex aStep(R"(\nStep \((\d+)\) ([^\n]*)\n)"), aArg(R"(^aArgv\[(\d+)\] (.*)$)");
  for (auto it = std::sregex_iterator(theTrace.begin(), theTrace.end(), aStep); it != std::sregex_iterator(); ++it) {
    SStepTrace aTrace{(*it)[2], {}};
    std::istringstream aLines(theTrace.substr(static_cast<size_t>(it->position() + it->length())));
    std::smatch aMatch;
    for (std::string aLine; std::getline(aLines, aLine) && std::regex_match(aLine, aMatch, aArg);)
      if (aMatch[1] != "0")
        aTrace.mArgs.push_back(aMatch[2]);
    aSteps.push_back(aTrace);
  }
  return aSteps;
}

class CoherenceCommand : public CommandTest {
protected:
  std::string mRoot;       // the simulated pair, ROOT_1 master and ROOT_2 slave
  std::string mParameters; // the parameter file's text

  void pair(std::vector<std::string> theOptions) {
    theOptions.insert(theOptions.end(), {"--command-file", file("cc.xml")});
    mRoot = tlrxSimulateSlc(mDir, "pair", theOptions);
    mParameters = tlrxReadFile(file("cc.xml"));
  }
  // Sets a key's text; nullptr removes the element.
  void set(const std::string &theKey, const char *theValue) {
    const std::regex aElement("<" + theKey + ">[^<]*</" + theKey + ">\n?");
    ASSERT_TRUE(std::regex_search(mParameters, aElement)) << theKey;
    const std::string aText = theValue == nullptr ? "" : "<" + theKey + ">" + theValue + "</" + theKey + ">\n";
    mParameters = std::regex_replace(mParameters, aElement, aText);
  }
  STLRXRun run() {
    tlrxWriteFile(file("cc.xml"), mParameters);
    tlrxWriteConfiguration(mDir.path(), {{12, "ACTIVE"}});
    resetWorking();
    // The log grows run after run and an old trace is kept aside: each run here starts both anew.
    std::remove(file("Process.log").c_str());
    std::remove(file("Process.trace").c_str());
    return tlrxRunMain("main_coherence#" + file("cc.xml"), mDir.path(), {{"TELLURIX_INIT_DIR", mDir.path()}});
  }
  // The rasters of the chain left in the folder, by suffix of the root.
  std::vector<std::string> rastersLeft() const {
    std::vector<std::string> aLeft;
    for (const char *aName : {"pair_1_pwr", "pair_2_pwr", "pair_int", "pair_sint", "pair_dint", "pair_fint",
                              "pair_cc", "pair_cc.tif"})
      if (tlrxFileExists(file(aName)))
        aLeft.push_back(aName);
    return aLeft;
  }
  // Mean coherence over blocks of theBlock x theBlock cells theMargin away
  // from the edges against the band theExpected gives for each column; the
  // distances of the blocks outside their bands.
  template <typename F>
  std::vector<double> blockDistances(int theBlock, int theMargin, int theBlockLines, F theExpected) {
    CRasterFile aRaster;
    aRaster.open_read(file("pair_cc").c_str());
    const int L = aRaster.getNrOfLinesPerImage(), P = aRaster.getNrOfPixelsPerLine();
    const int aRows = (L - 2 * theMargin) / theBlockLines, aCols = (P - 2 * theMargin) / theBlock;
    std::vector<double> aLine(static_cast<size_t>(P)), aSums(size_t(aRows * aCols), 0.0), aDistances;
    for (int l = theMargin; l < theMargin + theBlockLines * aRows; ++l) {
      aRaster.getLine(aLine.data(), l);
      for (int j = theMargin; j < theMargin + theBlock * aCols; ++j)
        aSums[size_t((l - theMargin) / theBlockLines * aCols + (j - theMargin) / theBlock)] += aLine[size_t(j)];
    }
    aRaster.close();
    for (int b = 0; b < aRows * aCols; ++b) {
      double aLow = 0, aHigh = 0;
      for (int j = 0; j < theBlock; ++j) {
        const std::pair<double, double> aBand = theExpected(theMargin + b % aCols * theBlock + j);
        aLow += aBand.first / theBlock;
        aHigh += aBand.second / theBlock;
      }
      const double aMean = aSums[size_t(b)] / (theBlock * theBlockLines);
      aDistances.push_back(std::max({aLow - aMean, aMean - aHigh, 0.0}));
    }
    return aDistances;
  }
};

// Touzi's expectation between 25 and 50 independent samples for the true
// coherence g: the range oversampling by 2 and its summation put a 5 x 5
// window between the two.
std::pair<double, double> touziBand(double g) { return {touzi(g, 50), touzi(g, 25)}; }

} // namespace

TEST(CoherenceCommandTheory, TouziSeriesMatchesTheTable) {
  const struct {
    int mN;
    double mG, mExpected;
  } aCases[] = {{9, 0.0, 0.300}, {25, 0.2, 0.254}, {25, 0.6, 0.607}, {49, 0.4, 0.409}, {100, 0.9, 0.900}};
  for (const auto &aCase : aCases)
    EXPECT_NEAR(touzi(aCase.mG, aCase.mN), aCase.mExpected, 0.0015) << aCase.mN << " " << aCase.mG;
}

// The whole chain on a pair moved by an affine field, with fringes over
// hills, their elevation model, and a coherence rising from 0.2 to 0.95
// across the columns, against Touzi's expectation for the true coherence.
// Block means of 32 x 32 scatter by about 0.017 at low coherence (the same
// on an ideal pair without shift or fringes), so about 6 % of them lie
// beyond 0.03 by chance: 90 % must lie within 0.03 and every one within
// 0.07, and columns 32 wide over the whole height within 0.02.
TEST_F(CoherenceCommand, CoherenceOfTheChainFollowsTheTrueCoherence) {
  pair({"--lines", "512", "--pixels", "512", "--shift-field", "0.4,2e-4,0,-0.3,0,1e-4", "--coherence-ramp",
        "0.2,0.95", "--phase-ramp", "0.01,0.03", "--topography", "20", "--dem", "400", "--seed", "5"});
  const STLRXRun aRun = run();
  ASSERT_EQ(aRun.mExitStatus, 0) << error() << aRun.mOutput;
  const auto aBand = [](int thePixel) { return touziBand(0.2 + 0.75 * thePixel / 511.0); };
  const std::vector<double> aBlocks = blockDistances(32, 32, 32, aBand);
  ASSERT_EQ(aBlocks.size(), 196u);
  EXPECT_LE(*std::max_element(aBlocks.begin(), aBlocks.end()), 0.07);
  EXPECT_GE(std::count_if(aBlocks.begin(), aBlocks.end(), [](double d) { return d <= 0.03; }), 177);
  for (double aDistance : blockDistances(32, 32, 448, aBand))
    EXPECT_LE(aDistance, 0.02);
}

// A fringe of 0.1 cycle per pixel at coherence 0.9 would leave about 0.6 in
// a 5 x 5 window; the synthetic phase and the flattening restore 0.9.
TEST_F(CoherenceCommand, FlatteningRestoresTheCoherenceUnderAFringe) {
  pair({"--lines", "256", "--pixels", "256", "--coherence", "0.9", "--phase-ramp", "0,0.1", "--seed", "2"});
  set("compute_param_flag", "NotOK");
  const STLRXRun aRun = run();
  ASSERT_EQ(aRun.mExitStatus, 0) << error() << aRun.mOutput;
  EXPECT_LE(blockDistances(192, 32, 192, [](int) { return touziBand(0.9); }).at(0), 0.02);
}

// The plan and the argument vectors of every step as the command passes
// them, for the switch combinations; the closing operations remove exactly
// their files.
TEST_F(CoherenceCommand, PlanArgumentsAndClosingOperationsFollowTheSwitches) {
  pair({"--lines", "256", "--pixels", "256", "--coherence", "0.7"});
  const std::string r = file("pair"), m = file("pair_1"), s = file("pair_2"), mp = file("pair_1_pwr"),
                    sp = file("pair_2_pwr"), aPar = file("pair_cc_par");
  const std::vector<std::string> aInterferogram = {m, s, aPar, mp, sp, r + "_int", "1", "1", "NotOK", "NotOK",
                                                   "OK", "OK", "1024", "50"};
  const std::vector<std::string> aSynthetic = {mp, sp, "NotOK", "NotOK", "NotOK", "10", "10", "0", r, "NotOK",
                                               "NotOK", "NotOK", "NotOK", "1.000000", "NotOK", "NotOK", aPar, "1",
                                               "1", "OK", "NotOK", "NotOK", "NotOK"};
  const std::vector<std::string> aFlattening = {r + "_int", r + "_sint", r, "NotOK", "NotOK", "NotOK"};
  const std::vector<std::string> aFilter = {r + "_dint", r + "_fint", "0.25", "2"};
  const std::vector<std::string> aTiff = {r + "_cc", r + "_cc.tif", "0.333", "1", "1"};
  const auto aCoherence = [&](const char *theInput) {
    return std::vector<std::string>{r + theInput, mp, sp, r + "_cc", "5"};
  };
  const struct {
    const char *mFilter, *mTiff, *mShut;
    std::vector<SStepTrace> mSteps;
    std::vector<std::string> mLeft;
  } aCases[] = {
      {"OK", "OK", "NotOK",
       {{"SLC interferogramme generation", aInterferogram}, {"Split Synt Phase Generation", aSynthetic},
        {"Flattening phase calculation", aFlattening}, {"Boxcar filter", aFilter},
        {"coherence generation", aCoherence("_fint")}, {"Coherence to tiff conversion", aTiff}},
       {"pair_1_pwr", "pair_2_pwr", "pair_int", "pair_sint", "pair_dint", "pair_fint", "pair_cc", "pair_cc.tif"}},
      {nullptr, nullptr, "OK",
       {{"SLC interferogramme generation", aInterferogram}, {"Split Synt Phase Generation", aSynthetic},
        {"Flattening phase calculation", aFlattening}, {"coherence generation", aCoherence("_dint")}},
       {"pair_cc"}},
      {"OK", "ok", "OK",
       {{"SLC interferogramme generation", aInterferogram}, {"Split Synt Phase Generation", aSynthetic},
        {"Flattening phase calculation", aFlattening}, {"Boxcar filter", aFilter},
        {"coherence generation", aCoherence("_fint")}},
       {"pair_dint", "pair_cc"}},
  };
  const std::string aFile = mParameters;
  for (const auto &aCase : aCases) {
    SCOPED_TRACE(std::string(aCase.mFilter ? aCase.mFilter : "-") + "," + (aCase.mTiff ? aCase.mTiff : "-") + "," +
                 aCase.mShut);
    mParameters = aFile;
    set("adat_filter_flag", aCase.mFilter);
    set("make_tiff", aCase.mTiff);
    set("shut_flag", aCase.mShut);
    ASSERT_EQ(run().mExitStatus, 0) << error();
    const std::vector<SStepTrace> aSteps = tracedSteps(trace());
    ASSERT_EQ(aSteps.size(), aCase.mSteps.size());
    for (size_t i = 0; i < aSteps.size(); ++i) {
      EXPECT_EQ(aSteps[i].mName, aCase.mSteps[i].mName) << i;
      EXPECT_EQ(aSteps[i].mArgs, aCase.mSteps[i].mArgs) << aSteps[i].mName;
    }
    EXPECT_EQ(rastersLeft(), aCase.mLeft);
    EXPECT_TRUE(tlrxContains(trace(), "INT TOTAL TIME (s): "));
    for (const std::string &aName : rastersLeft())
      fdfDeleteRaster(file(aName).c_str(), true, true);
  }
}

// Every key is logged under its heading; an absent spectral shift flag is
// on, an absent orbital correction flag is passed as "NotOK" unlogged; the
// co-registration runs when asked or when its file is missing, not else.
TEST_F(CoherenceCommand, KeysAreLoggedAndTheCoregistrationRunsWhenNeeded) {
  pair({"--lines", "256", "--pixels", "256", "--coherence", "0.7"});
  set("int_spectral_shift_filter_flag", nullptr);
  set("synt_automatic_slave_orbital_correction_flag", nullptr);
  set("compute_param_flag", "NotOK");
  const std::string aStars = std::string(160, '*') + "\n\n";
  ASSERT_EQ(run().mExitStatus, 0) << error();
  const std::string aLog = log();
  size_t aAt = 0;
  for (const std::string &aLine :
       {"\n\n\n\nINTERFEROMETRIC PARAMETERS\n\n" + aStars, std::string("\nint_spectral_shift_filter_flag: [TRUE]"),
        std::string("\nint_doppler_filter_flag: [TRUE]"), std::string("\nint_blocksize: [1024]"),
        std::string("\nint_block_overlap: [50]"), "\n\n\n\nFLATTENING PARAMETERS\n\n" + aStars,
        std::string("\nin_dem_file_name: [NotOK]"), std::string("\nsynt_phase_orbit_interp_val: [0]"),
        std::string("\nsynt_resamp_grid_size: [1.000000]"), std::string("\nsynt_optimal_resolution_flag: [NotOK]"),
        "\n\n\n\nMAIN PARAMETERS\n\n" + aStars, "\nin_master_file_name: [" + file("pair_1") + "]",
        "\nout_root_file_name: [" + file("pair_cc") + "]", std::string("\ncompute_param_flag: [FALSE]"),
        std::string("\nbaseline: [NotOK]"), std::string("\nrg_looks: [1]"), std::string("\nshut_flag: [FALSE]"),
        std::string("\nsaturation_default: [0.333]"),
        "\nOUTPUT MASTER FILE NAME : [ " + file("pair_1_pwr") + " ]\nOUTPUT SLAVE FILE NAME : [ " +
            file("pair_2_pwr") + " ]\nOUTPUT ROOT FILE NAME : [ " + file("pair") + " ]"}) {
    const size_t aFound = aLog.find(aLine, aAt);
    EXPECT_NE(aFound, std::string::npos) << aLine;
    aAt = aFound == std::string::npos ? aAt : aFound;
  }
  EXPECT_FALSE(tlrxContains(aLog, "synt_automatic_slave_orbital_correction_flag"));
  const std::vector<SStepTrace> aSteps = tracedSteps(trace());
  ASSERT_GE(aSteps.size(), 2u);
  EXPECT_EQ(aSteps[0].mArgs.at(10), "OK");
  EXPECT_EQ(aSteps[1].mArgs.at(14), "NotOK");
  // The parameter file was missing: estimated although not asked for.
  EXPECT_TRUE(tlrxContains(aLog, "\ncc_SNR_threshold"));
  ASSERT_TRUE(tlrxFileExists(file("pair_cc_par.sml")));
  ASSERT_EQ(run().mExitStatus, 0) << error();
  EXPECT_FALSE(tlrxContains(log(), "\ncc_SNR_threshold"));
  set("compute_param_flag", "OK");
  ASSERT_EQ(run().mExitStatus, 0) << error();
  EXPECT_TRUE(tlrxContains(log(), "\ncc_SNR_threshold"));
}

// Failures before the chain and inside it: the numbered code naming the file
// or key, and no result of the chain left behind.
TEST_F(CoherenceCommand, FailuresNameTheirCauseAndLeaveNoResult) {
  pair({"--lines", "256", "--pixels", "256", "--coherence", "0.7"});
  const std::string aFile = mParameters, aAbsent = "(absent)";
  const struct {
    std::string mKey, mValue;
    int mExit, mCode;
    std::string mNamed;
  } aCases[] = {
      {"TellurixEnvironment", "idl_envi_env", 8, 456960, file("cc.xml")},
      {"in_dem_file_name", aAbsent, 14, 848642, "FLAT_CMD.in_dem_file_name"},
      {"int_blocksize", aAbsent, 14, 848642, "INTERF_CMD.int_blocksize"},
      {"rg_looks", "two", 8, 456960, "MAIN_CMD.rg_looks"},
      {"out_root_file_name", "", 8, 456960, "MAIN_CMD.out_root_file_name"},
      {"coherence_corr_box_size", "5x5", 8, 456960, "MAIN_CMD.coherence_corr_box_size"},
      // the parameter file the chain writes may not be an input
      {"input_param_file_name", file("pair_1"), 8, 456960, file("pair_1")},
      // nor may a result land on the elevation model
      {"in_dem_file_name", file("pair_cc"), 8, 456960, file("pair_cc")},
      // a step that fails after others succeeded
      {"coherence_corr_box_size", "1", 8, 456962, ""},
  };
  for (const auto &aCase : aCases) {
    SCOPED_TRACE(aCase.mKey + "=" + aCase.mValue);
    mParameters = aFile;
    set(aCase.mKey, aCase.mValue == aAbsent ? nullptr : aCase.mValue.c_str());
    if (aCase.mValue == file("pair_cc"))
      image("pair_cc", {100, 200, 300, 400}, 2);
    expectFailure(run(), aCase.mExit, aCase.mCode, aCase.mNamed);
    fdfDeleteRaster(file("pair_cc").c_str(), true, true);
    EXPECT_TRUE(rastersLeft().empty()) << rastersLeft().front();
  }
  // A parameter file that cannot be read fails as the shared protocol reads it.
  expectFailure(tlrxRunMain("main_coherence#" + file("missing.xml"), mDir.path()), 5, 261121, file("missing.xml"));
}
