// Runs side by side: eight runs of every command started at once, each with
// its own working and batch folder, write what the same runs write one after
// the other.
#include "tlrx_command_test_support.h"
#include "tlrx_slc_test_support.h"
#include "tlrx_temporal_test_support.h"

#include <future>
#include <regex>
#include <sys/stat.h>

namespace {

// One run: its command and the argument or parameter file's text, with
// "OUT/" standing for the folder its results go to.
struct SRunCase {
  std::string mCommand;
  std::string mText;
};

class ConcurrentRunsTest : public CommandTest {
protected:
  // Runs theCase with the working and batch folder theWork and the results
  // in theOut, both made here.
  STLRXRun runCase(const SRunCase &theCase, const std::string &theWork, const std::string &theOut) const {
    for (const std::string &aFolder : {theWork, theOut})
      EXPECT_EQ(mkdir(aFolder.c_str(), 0755), 0) << aFolder;
    tlrxWriteFile(theWork + "Process.working", "0\nhost\n");
    tlrxWriteFile(theWork + "args", std::regex_replace(theCase.mText, std::regex("OUT/"), theOut));
    return tlrxRunMain(theCase.mCommand + theWork + "args", theWork, {{"TELLURIX_THREADS", "2"}});
  }
  static std::string tokens(const std::vector<std::string> &theTokens) {
    std::string aText = "arguments\n";
    for (const std::string &aToken : theTokens)
      aText += aToken + "\n";
    return aText;
  }
};

} // namespace

TEST_F(ConcurrentRunsTest, EightRunsAtOnceWriteWhatTheyWriteOneAfterTheOther) {
  simulate({"series", "--out", file("s"), "--count", "4", "--lines", "97", "--pixels", "61", "--cell-type", "FLOAT",
            "--null", "-1", "--nodata-fraction", "0.02"});
  simulate({"pair", "--out", file("p"), "--coherence", "0.6", "--lines", "97", "--pixels", "61"});
  tlrxSimulateSlc(mDir, "c", {"--lines", "181", "--pixels", "163", "--coherence", "0.7", "--phase-ramp", "0.01,0.03",
                              "--command-file", file("cc.xml")});
  STLRXTemporalParameters aTemporal;
  for (int i = 1; i <= 4; ++i)
    aTemporal.mInputs.push_back(file("s_0" + std::to_string(i)));
  aTemporal.mRoot = "OUT/f";
  for (const char *aSwitch : {"mean", "std", "median", "max", "min", "date_max"})
    aTemporal.mSettings.push_back({aSwitch, "OK"});
  const std::string aList = file("s_list.txt");
  const std::vector<SRunCase> aCases = {
      {"main_ratio#", tokens({aList, "OUT/r", "0", "x", "OK", "0.3"})},
      {"main_ratio#", tokens({aList, "OUT/d", "1", "x", "NO", "0"})},
      {"main_min_and_max#", tokens({aList, "OUT/m", "2", "3", "4", "5", "6", "OK", "0.3"})},
      {"main_texture#", tokens({file("p_1"), "OUT/x.img", "0", "7", "5", "x", "OK", "0"})},
      {"main_texture#", tokens({file("p_2"), "OUT/y.img", "0", "3", "3", "x", "NO", "0"})},
      {"main_correlation#", tokens({file("p_1"), file("p_2"), "OUT/c", "-5", "4", "5", "7", "3", "NO", "OK", "0.3"})},
      {"main_temporal_feature_extraction#", tlrxTemporalParameterText(aTemporal)},
      {"main_coherence#", std::regex_replace(tlrxReadFile(file("cc.xml")), std::regex("<out_root_file_name>[^<]*<"),
                                             "<out_root_file_name>OUT/cc<")},
  };
  for (size_t k = 0; k < aCases.size(); ++k) {
    const STLRXRun aRun = runCase(aCases[k], file("w" + std::to_string(k) + "/"), file("o" + std::to_string(k) + "/"));
    ASSERT_EQ(aRun.mExitStatus, 0) << aCases[k].mCommand << aRun.mOutput;
  }
  std::vector<std::future<STLRXRun>> aRuns;
  for (size_t k = 0; k < aCases.size(); ++k)
    aRuns.push_back(std::async(std::launch::async, [&, k] {
      return runCase(aCases[k], file("W" + std::to_string(k) + "/"), file("O" + std::to_string(k) + "/"));
    }));
  for (size_t k = 0; k < aCases.size(); ++k) {
    const STLRXRun aRun = aRuns[k].get();
    EXPECT_EQ(aRun.mExitStatus, 0) << aCases[k].mCommand << aRun.mOutput;
    const std::string aWhat = aCases[k].mCommand + " run " + std::to_string(k);
    tlrxExpectSameFolders(tlrxFolderContents(file("o" + std::to_string(k) + "/")),
                          tlrxFolderContents(file("O" + std::to_string(k) + "/")), aWhat);
    // A clean success removes its own working file, and only its own.
    EXPECT_FALSE(tlrxFileExists(file("W" + std::to_string(k) + "/Process.working"))) << aWhat;
  }
}
