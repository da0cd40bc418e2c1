// Every command run with 1, 2 and 3 threads on scenes of odd sizes gives the
// same files, byte for byte; a run interrupted mid-way with several threads
// ends as one with one thread does.
#include "tlrx_command_test_support.h"
#include "tlrx_slc_test_support.h"
#include "tlrx_temporal_test_support.h"

#include <chrono>
#include <future>
#include <regex>
#include <sys/stat.h>
#include <thread>

namespace {

class ThreadsTest : public CommandTest {
protected:
  void SetUp() override {
    CommandTest::SetUp();
    tlrxWriteConfiguration(mDir.path(), {{12, "ACTIVE"}});
  }
  // A dated FLOAT series ROOT_01 .. of theCount images with some no data.
  std::string series(const std::string &theRoot, int theCount, int theLines, int thePixels) {
    simulate({"series", "--out", file(theRoot), "--count", std::to_string(theCount), "--lines",
              std::to_string(theLines), "--pixels", std::to_string(thePixels), "--cell-type", "FLOAT", "--null", "-1",
              "--nodata-fraction", "0.02", "--seed", "7"});
    return file(theRoot + "_list.txt");
  }
  // Runs theRun(folder) with TELLURIX_THREADS 1, 2 and 3, each writing into
  // a folder of its own, and expects the three folders to hold the same
  // files with the same bytes (headers with the folder's name taken out).
  void expectSameForEveryThreadCount(const std::string &theWhat,
                                     const std::function<STLRXRun(const std::string &, const std::string &)> &theRun) {
    std::vector<std::vector<std::string>> aContents;
    for (const char *aThreads : {"1", "2", "3"}) {
      const std::string aFolder = file(std::to_string(++mRuns) + "/");
      ASSERT_EQ(mkdir(aFolder.c_str(), 0755), 0);
      resetWorking();
      std::remove(file("Process.trace").c_str());
      const STLRXRun aRun = theRun(aFolder, aThreads);
      ASSERT_EQ(aRun.mExitStatus, 0) << theWhat << " with " << aThreads << " threads: " << error() << aRun.mOutput;
      EXPECT_TRUE(tlrxContains(trace(), "threads = " + std::string(aThreads) + "\n")) << theWhat;
      aContents.push_back(tlrxFolderContents(aFolder));
    }
    for (size_t t = 1; t < aContents.size(); ++t)
      tlrxExpectSameFolders(aContents[0], aContents[t], theWhat + " with " + std::to_string(t + 1) + " threads");
  }
  // The test's configuration (tracing on) and the thread count.
  std::map<std::string, std::string> threads(const std::string &theCount) const {
    return {{"TELLURIX_THREADS", theCount}, {"TELLURIX_INIT_DIR", mDir.path()}};
  }
  int mRuns = 0;
  STLRXRun command(const std::string &theCommand, const std::vector<std::string> &theTokens,
                   const std::string &theThreads) const {
    std::string aText = "arguments\n";
    for (const std::string &aToken : theTokens)
      aText += aToken + "\n";
    tlrxWriteFile(file("args.txt"), aText);
    return tlrxRunMain(theCommand + file("args.txt"), mDir.path(), threads(theThreads));
  }
};

} // namespace

// Sizes: several bands and a last block cut short for every line schedule
// (blocks of 2 and 8 lines, windows of 7 and 4 rows); GeoTIFFs included.
TEST_F(ThreadsTest, RatioMinMaxAndTemporalFeaturesDoNotDependOnTheThreadCount) {
  const std::string aList = series("s", 4, 211, 67);
  expectSameForEveryThreadCount("ratio", [&](const std::string &theOut, const std::string &theThreads) {
    return command("main_ratio#", {aList, theOut + "r", "1", "x", "OK", "0.3"}, theThreads);
  });
  expectSameForEveryThreadCount("min and max", [&](const std::string &theOut, const std::string &theThreads) {
    return command("main_min_and_max#", {aList, theOut + "m", "2", "3", "4", "5", "6", "OK", "0.3"}, theThreads);
  });
  expectSameForEveryThreadCount("temporal", [&](const std::string &theOut, const std::string &theThreads) {
    STLRXTemporalParameters aParameters;
    for (int i = 1; i <= 4; ++i)
      aParameters.mInputs.push_back(file("s_0" + std::to_string(i)));
    aParameters.mRoot = theOut + "f";
    for (const char *aSwitch : {"mean", "std", "median", "gradient", "max", "min", "span_max_less_min",
                                "max_less_min_sup", "max_on_min_inf", "date_max", "date_min_before_max"})
      aParameters.mSettings.push_back({aSwitch, "OK"});
    tlrxWriteFile(file("param.xml"), tlrxTemporalParameterText(aParameters));
    return tlrxRunMain("main_temporal_feature_extraction#" + file("param.xml"), mDir.path(), threads(theThreads));
  });
}

TEST_F(ThreadsTest, WindowCommandsDoNotDependOnTheThreadCount) {
  simulate({"pair", "--out", file("p"), "--scene", "flat", "--coherence", "0.6", "--lines", "233", "--pixels", "71",
            "--seed", "3"});
  expectSameForEveryThreadCount("texture", [&](const std::string &theOut, const std::string &theThreads) {
    return command("main_texture#", {file("p_1"), theOut + "x.img", "0", "7", "5", "x", "OK", "0"}, theThreads);
  });
  expectSameForEveryThreadCount("correlation", [&](const std::string &theOut, const std::string &theThreads) {
    return command("main_correlation#",
                   {file("p_1"), file("p_2"), theOut + "c", "-5", "4", "5", "7", "3", "NO", "OK", "0.3"}, theThreads);
  });
}

// The whole chain, its intermediate rasters kept: co-registration estimated,
// both interferogram filters, synthetic phase, flattening, adaptive filter,
// coherence and GeoTIFF.
TEST_F(ThreadsTest, CoherenceChainDoesNotDependOnTheThreadCount) {
  tlrxSimulateSlc(mDir, "pair", {"--lines", "301", "--pixels", "203", "--coherence-ramp", "0.3,0.9", "--phase-ramp",
                                 "0.01,0.04", "--seed", "4", "--command-file", file("cc.xml")});
  const std::string aParameters = tlrxReadFile(file("cc.xml"));
  expectSameForEveryThreadCount("coherence", [&](const std::string &theOut, const std::string &theThreads) {
    std::string aText = std::regex_replace(aParameters, std::regex("<out_root_file_name>[^<]*<"),
                                           "<out_root_file_name>" + theOut + "cc<");
    aText = std::regex_replace(aText, std::regex("<flattening_adaptive_filter_flag>[^<]*<"),
                               "<flattening_adaptive_filter_flag>OK<");
    tlrxWriteFile(file("cc.xml"), aText);
    return tlrxRunMain("main_coherence#" + file("cc.xml"), mDir.path(), threads(theThreads));
  });
}

// The host asks to stop once the run has passed 10 %: with 3 threads as with
// one, the run ends with the interruption code and leaves no result.
TEST_F(ThreadsTest, InterruptionMidWayEndsAsWithOneThread) {
  simulate({"constant", "--out", file("big"), "--value", "5", "--lines", "6000", "--pixels", "600"});
  for (const char *aThreads : {"1", "3"}) {
    resetWorking();
    std::future<STLRXRun> aRun = std::async(std::launch::async, [&] {
      return command("main_texture#", {file("big"), file("out.img"), "0", "15", "15", "x", "NO", "0"}, aThreads);
    });
    // Waits for a percentage of 10 or more in the working file, then asks
    // to stop, again and again: the run may rewrite the file in between.
    bool aAsked = false;
    while (aRun.wait_for(std::chrono::milliseconds(1)) != std::future_status::ready) {
      const int aPercent = std::atoi(tlrxReadFile(working()).c_str());
      aAsked = aAsked || (aPercent >= 10 && aPercent < 100);
      if (aAsked)
        resetWorking("101");
    }
    const STLRXRun aResult = aRun.get();
    ASSERT_TRUE(aAsked) << "the run ended before the host could stop it: " << aResult.mOutput << error();
    expectFailure(aResult, 6, 326400);
    EXPECT_FALSE(tlrxFileExists(file("out.img"))) << aThreads;
    EXPECT_FALSE(tlrxFileExists(file("out.img.sml"))) << aThreads;
  }
}

// A thread count that is not one ends the run before any result exists.
TEST_F(ThreadsTest, BadThreadCountIsRefusedBeforeAnyResult) {
  const std::string aList = series("s", 2, 5, 4);
  for (const char *aValue : {"0", "two", "300"}) {
    resetWorking();
    expectFailure(command("main_ratio#", {aList, file("r"), "0", "x", "NO", "0"}, aValue), 13, 783360,
                  "TELLURIX_THREADS = \"" + std::string(aValue) + "\"");
    EXPECT_FALSE(tlrxFileExists(file("r_rto"))) << aValue;
  }
}
