// A run never destroys a file it was only meant to read, and a failed run
// leaves no result that looks complete: commands run the way a careless user
// would, the folder compared file by file before and after.
#include "tlrx_command_test_support.h"
#include "tlrx_temporal_test_support.h"

#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <functional>
#include <map>

namespace {

using CFolderSnapshot = std::map<std::string, std::string>;

class UserFilesTest : public CommandTest {
protected:
  // A dated image of theLines lines of the values, without a null value.
  void image(const std::string &theName, const std::vector<double> &theValues, int theDay, int theLines = 1) const {
    CommandTest::image(theName, theValues, theLines,
                       (theDay < 10 ? "0" : "") + std::to_string(theDay) + "-JAN-2010 00:00:00.000000", false);
  }
  void stack(int theLines = 2) {
    for (int i = 0; i < 3; ++i)
      image(std::string(1, static_cast<char>('a' + i)), std::vector<double>(4 * theLines, 1 << i), i + 1, theLines);
  }

  // Every file of the folder but the status, argument and list files, with
  // its content.
  CFolderSnapshot snapshot() const {
    CFolderSnapshot aFiles;
    for (const auto &aEntry : std::filesystem::directory_iterator(mDir.path())) {
      const std::string aName = aEntry.path().filename().string();
      if (aName.rfind("Process", 0) != 0 && aName.rfind("args", 0) != 0 && aName != "list.txt")
        aFiles[aName] = tlrxReadFile(file(aName));
    }
    return aFiles;
  }

  STLRXRun ratio(const std::string &theRoot, const std::string &theTiff = "NO") {
    return runCommand("main_ratio#", {file("list.txt"), file(theRoot), "0", "x", theTiff, "0"});
  }
  STLRXRun minMax(const std::string &theRoot, const std::string &theTiff = "NO") {
    return runCommand("main_min_and_max#", {file("list.txt"), file(theRoot), "1", "2", "3", "4", "5", theTiff, "0"});
  }
  STLRXRun texture(const std::string &theInput, const std::string &theOutput) {
    return runCommand("main_texture#", {file(theInput), theOutput, "0", "3", "3", "x", "NO", "0"});
  }
  STLRXRun correlation(const std::string &theRoot) {
    return runCommand("main_correlation#", {file("a"), file("b"), theRoot, "0", "3", "3", "3", "3", "OK", "NO", "0"});
  }
  STLRXRun temporal(const std::vector<std::string> &theInputs, const std::string &theRoot,
                    const std::vector<std::pair<std::string, std::string>> &theSettings = {{"mean", "OK"}}) {
    STLRXTemporalParameters aParameters;
    for (const std::string &aInput : theInputs)
      aParameters.mInputs.push_back(file(aInput));
    aParameters.mRoot = theRoot.empty() ? "" : file(theRoot);
    aParameters.mSettings = theSettings;
    tlrxWriteFile(file("args.xml"), tlrxTemporalParameterText(aParameters));
    return tlrxRunMain("main_temporal_feature_extraction#" + file("args.xml"), mDir.path());
  }
};

} // namespace

TEST_F(UserFilesTest, ResultsNamedLikeInputsAreRefusedBeforeAnythingIsWritten) {
  stack();
  // Inputs that the results of each case would land on.
  for (const char *aName : {"q_rto", "z_max", "w_mea"})
    image(aName, std::vector<double>(8, 1.0), 4, 2);
  ASSERT_EQ(symlink(file("a").c_str(), file("link_to_a").c_str()), 0);
  ASSERT_EQ(symlink(file("a.sml").c_str(), file("u.sml").c_str()), 0);
  ASSERT_EQ(link(file("a").c_str(), file("hard_a").c_str()), 0);
  const std::string aRelative = "../" + mDir.path().substr(mDir.path().rfind('/', mDir.path().size() - 2) + 1) + "a";
  const struct {
    const char *mCase;
    std::function<STLRXRun()> mRun;
    int mStatus, mCode;
    std::string mNamed;
  } aCases[] = {
      {"texture onto its input", [&] { return texture("a", file("a")); }, 8, 456962, file("a")},
      {"texture through a link", [&] { return texture("a", file("link_to_a")); }, 8, 456962, "link_to_a"},
      {"texture through a hard link", [&] { return texture("a", file("hard_a")); }, 8, 456962, "hard_a"},
      {"texture through a relative path", [&] { return texture("a", aRelative); }, 8, 456962, aRelative},
      {"texture header onto an input header", [&] { return texture("a", file("u")); }, 8, 456962, "u.sml"},
      {"texture named like a header", [&] { return texture("a", file("t.sml")); }, 8, 456962, "t.sml"},
      {"correlation onto input 2", [&] { return correlation(file("b")); }, 8, 456962, file("b")},
      {"ratio pair onto an input", [&] { list({"a", "q_rto"}); return ratio("q"); }, 8, 456962, "q_rto"},
      {"min and max onto an input", [&] { list({"a", "z_max"}); return minMax("z"); }, 8, 456962, "z_max"},
      {"temporal mean onto an input", [&] { return temporal({"w_mea", "b"}, "w"); }, 8, 456960, "w_mea"},
  };
  for (const auto &aCase : aCases) {
    SCOPED_TRACE(aCase.mCase);
    const CFolderSnapshot aBefore = snapshot();
    expectFailure(aCase.mRun(), aCase.mStatus, aCase.mCode, aCase.mNamed);
    EXPECT_TRUE(snapshot() == aBefore) << "files changed, added or removed";
  }
}

TEST_F(UserFilesTest, TemporariesNeverTakeTheNamesOfUserFilesAndPartsOfKilledRunsGoWithTheNextRun) {
  stack();
  // A root beside the user's "results.txt" and "results.hdr", and a root
  // equal to an input's name: its headers are the user's too.
  tlrxWriteFile(file("results.txt"), "notes");
  tlrxWriteFile(file("results.hdr"), "ENVI of something else");
  const CFolderSnapshot aBefore = snapshot();
  for (const char *aRoot : {"results", "a"}) {
    SCOPED_TRACE(aRoot);
    ASSERT_EQ(temporal({"a", "b", "c"}, aRoot).mExitStatus, 0) << error();
  }
  CFolderSnapshot aAfter = snapshot();
  for (const char *aResult : {"results_mea", "a_mea"}) {
    EXPECT_EQ(tlrxReadTestRaster(file(aResult)), std::vector<double>(8, static_cast<float>(7.0 / 3.0))) << aResult;
    for (const char *aSuffix : {"", ".sml", ".hdr"})
      EXPECT_EQ(aAfter.erase(std::string(aResult) + aSuffix), 1u) << aResult << aSuffix;
  }
  EXPECT_TRUE(aAfter == aBefore) << "only the results are new; nothing else changed";
  // Parts left by killed runs go with the next run of that result: the pid of
  // a process that has ended, not one that is alive, nor names that only look
  // like parts.
  list({"a", "b"});
  const pid_t aEnded = fork();
  if (aEnded == 0)
    _exit(0);
  waitpid(aEnded, nullptr, 0);
  const std::string aStale = "out_min.part-" + std::to_string(aEnded);
  const std::string aAlive = "out_min.part-" + std::to_string(getpid());
  for (const std::string &aName : {aStale, aAlive, std::string("out_min.part-12x"), std::string("out_max.part-1.sml")})
    tlrxWriteFile(file(aName), "partial");
  ASSERT_EQ(minMax("out").mExitStatus, 0) << error();
  EXPECT_FALSE(tlrxFileExists(file(aStale)));
  for (const char *aName : {"out_min.part-12x", "out_max.part-1.sml"})
    EXPECT_TRUE(tlrxFileExists(file(aName))) << aName;
  EXPECT_TRUE(tlrxFileExists(file(aAlive)));
}

// Failed, refused and interrupted runs leave the folder as it was: a rerun
// over a good result that fails on its inputs keeps the old result (values,
// dates and headers); a ratio whose second pair fails keeps neither pair; a
// temporal run whose quick-look fails after every raster is written (one
// input: the deviation holds no valid sample) keeps none; a temporal run
// that would write nothing writes nothing, in the current folder neither.
TEST_F(UserFilesTest, FailedRefusedOrInterruptedRunsLeaveTheFolderAsItWas) {
  stack(64);
  image("short", {1, 1, 1, 1}, 9, 1);
  list({"a", "b"});
  ASSERT_EQ(minMax("good", "OK").mExitStatus, 0) << error();
  ASSERT_EQ(ratio("good").mExitStatus, 0) << error();
  const CFolderSnapshot aBefore = snapshot();
  const std::vector<std::pair<std::string, std::string>> aStd = {{"mean", "OK"}, {"std", "OK"}, {"make_tiff", "OK"}};
  const struct {
    const char *mCase;
    std::function<STLRXRun()> mRun;
    int mStatus, mCode;
    std::string mNamed;
  } aCases[] = {
      {"min and max rerun", [&] { list({"a", "short"}); return minMax("good", "OK"); }, 11, 652803, ""},
      {"ratio fails at its second pair", [&] { list({"a", "b", "short"}); return ratio("new"); }, 11, 652807, ""},
      {"temporal quick-look fails", [&] { return temporal({"a"}, "one", aStd); }, 3, 130564, ""},
      {"every temporal output off",
       [&] { return temporal({"a", "b"}, "none", {{"mean", "NotOK"}, {"make_tiff", "OK"}}); }, 8, 456960,
       "no output switch"},
      {"empty temporal root", [&] { return temporal({"a", "b"}, "", {{"out_root_file_name", ""}, {"mean", "OK"}}); }, 8,
       456960, "MAIN_CMD.out_root_file_name"},
      {"min and max interrupted", [&] { list({"a", "b", "c"}); resetWorking("101"); return minMax("out"); }, 6, 326400,
       ""},
      {"temporal interrupted", [&] { resetWorking("101"); return temporal({"a", "b", "c"}, "out"); }, 6, 326400, ""},
  };
  for (const auto &aCase : aCases) {
    SCOPED_TRACE(aCase.mCase);
    expectFailure(aCase.mRun(), aCase.mStatus, aCase.mCode, aCase.mNamed);
    EXPECT_TRUE(snapshot() == aBefore) << "a result or a temporary was left or changed";
  }
}

