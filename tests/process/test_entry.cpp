// The built program run as a host runs it: exit status, log, trace, working
// file and error file.
#include "tlrx_command_test_support.h"

#include <filesystem>
#include <set>

namespace {

class EntryTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxWriteFile(workingFile(), "12\nhost status line\n"); }
  std::string workingFile() const { return mDir.file("Process.working"); }
  std::string log() const { return tlrxReadFile(mDir.file("Process.log")); }
  std::string error() const { return tlrxReadFile(workingFile() + "_error"); }
  // A configuration of our own in the temporary folder.
  std::map<std::string, std::string> withConfiguration(const std::map<int, std::string> &theLines, int theCount = 14) {
    tlrxWriteConfiguration(mDir.path(), theLines, theCount);
    return {{"TELLURIX_INIT_DIR", mDir.path()}};
  }
};

// The first lines of thePath are theLines ("*" for any).
void expectLines(const std::string &thePath, const std::vector<std::string> &theLines) {
  const std::vector<std::string> aLines = tlrxReadLines(thePath);
  ASSERT_GE(aLines.size(), theLines.size()) << thePath;
  for (size_t i = 0; i < theLines.size(); ++i)
    if (theLines[i] != "*")
      EXPECT_EQ(aLines[i], theLines[i]) << thePath << " line " << i;
}

std::set<std::string> namesIn(const std::string &theDir) {
  std::set<std::string> aNames;
  for (const auto &aEntry : std::filesystem::directory_iterator(theDir))
    aNames.insert(aEntry.path().filename().string());
  return aNames;
}

} // namespace

TEST_F(EntryTest, UnknownCommandReportsEverywhereWhateverTheTrailerStreamsAndFolders) {
  EXPECT_EQ(tlrxRunMain("main_principal_component_analysis#x", mDir.path()).mExitStatus, 8);
  expectLines(workingFile() + "_error", {"-1", "COMMAND PARAMETER ERROR", "Unknown command [EC :456963]"});
  expectLines(workingFile(), {"-1", "host status line", "*", "Unknown command [EC :456963]"});
  const std::string aLog = log();
  EXPECT_TRUE(tlrxContains(aLog, "[ERROR ID : 456963]\n  COMMAND PARAMETER ERROR [Unknown command]\n   \n\n"));
  EXPECT_TRUE(tlrxContains(aLog, "\nERROR :\n   \n\n"));
  EXPECT_TRUE(tlrxContains(aLog, "\nEND : Tellurix Feature Extraction"));
  EXPECT_FALSE(tlrxFileExists(mDir.file("Process.trace")));
  // A trailer is cut before matching; the arguments are joined; both traced.
  const auto aEnv = withConfiguration({{12, "ACTIVE"}});
  EXPECT_EQ(tlrxRunMain("main_principal_component_analysis#x###Tellurix###main_ratio#y", mDir.path(), aEnv).mExitStatus,
            8);
  const std::string aTrace = tlrxReadFile(mDir.file("Process.trace"));
  EXPECT_TRUE(tlrxContains(aTrace, "\nlpCmdLine =main_principal_component_analysis#x\n"));
  EXPECT_TRUE(tlrxContains(aTrace, "aCommand =5\n"));
  EXPECT_TRUE(tlrxContains(aTrace, "LINE=100"));
  // An error run keeps a dated copy of the trace.
  EXPECT_EQ(tlrxRun("/bin/sh", {"-c", "ls Process_*_trace.txt"}, mDir.path()).mExitStatus, 0);
  tlrxRun("main_features_extraction", {"main_texture#a", "b"}, mDir.path(), aEnv);
  EXPECT_TRUE(tlrxContains(tlrxReadFile(mDir.file("Process.trace")), "lpCmdLine =main_texture#a b\n"));
  // Closed standard streams do not capture the files.
  std::remove(mDir.file("Process.log").c_str());
  std::remove((workingFile() + "_error").c_str());
  const std::string aClosed = "exec 0<&- 1>&- 2>&-; TELLURIX_WORKING_DIR=" + mDir.path() + " TELLURIX_BATCH_DIR=" +
                              mDir.path() + " " + tlrxBinPath("main_features_extraction") + " x";
  EXPECT_EQ(tlrxRun("/bin/sh", {"-c", aClosed}, mDir.path()).mExitStatus, 8);
  EXPECT_TRUE(tlrxContains(log(), "[ERROR ID : 456963]"));
  EXPECT_TRUE(tlrxNamesCode(error(), 456963));
  // The batch folder and the working file's name come from the environment.
  CTempDir aBatch;
  tlrxWriteFile(aBatch.file("job.work"), "0\nhost\n");
  std::remove(mDir.file("Process.log").c_str());
  const std::map<std::string, std::string> aJob = {{"TELLURIX_BATCH_DIR", aBatch.path()},
                                                    {"TELLURIX_WORKING_FILE", "job.work"}};
  EXPECT_EQ(tlrxRunMain("bad", mDir.path(), aJob).mExitStatus, 8);
  EXPECT_TRUE(tlrxNamesCode(tlrxReadFile(aBatch.file("job.work_error")), 456963));
  expectLines(aBatch.file("job.work"), {"-1"});
  EXPECT_TRUE(tlrxFileExists(mDir.file("Process.log")));
}

// The command prefix is case sensitive and needs its hash; configuration,
// catalogue and working folder failures are numbered errors.
TEST_F(EntryTest, FailuresExitWithTheirStatusAndNameTheirCode) {
  CTempDir aEmpty, aBadCatalogue;
  tlrxWriteFile(aBadCatalogue.file("tlrx_errors_catalog.des"), "40\nC\nA\n");
  const struct {
    std::string mCommand;
    std::map<int, std::string> mConfiguration;
    int mLines, mExit, mCode; // mLines 0: the build tree's configuration
    std::map<std::string, std::string> mEnv;
    std::string mNamed;
  } aCases[] = {
      {"MAIN_RATIO#abc", {}, 0, 8, 456963, {}, ""},
      {"main_ratio", {}, 0, 8, 456963, {}, ""},
      {"", {}, 0, 8, 456963, {}, ""},
      {"main_ratio#x", {}, 0, 5, 261122, {{"TELLURIX_INIT_DIR", aEmpty.path()}}, ""},
      {"main_ratio#x", {}, 2, 13, 783360, {}, "TELLURIX_WORKING_DIR"},
      {"main_ratio#x", {{6, aEmpty.path()}}, 14, 5, 261122, {}, ""},
      {"main_ratio#x", {{6, aBadCatalogue.path()}}, 14, 5, 261121, {}, ""},
      {"main_ratio#x", {}, 0, 5, 261122, {{"TELLURIX_WORKING_DIR", mDir.path() + "missing/folder"}},
       "missing/folder/Process.log"},
      {"main_ratio#x", {}, 13, 13, 783360, {}, "TELLURIX_DUMMY_VALUE"},
  };
  for (const auto &aCase : aCases) {
    SCOPED_TRACE(aCase.mCommand + " " + std::to_string(aCase.mCode) + " " + aCase.mNamed);
    std::remove((workingFile() + "_error").c_str());
    std::remove(mDir.file("Process.log").c_str());
    SetUp();
    const auto aEnv = aCase.mLines == 0 ? aCase.mEnv : withConfiguration(aCase.mConfiguration, aCase.mLines);
    EXPECT_EQ(tlrxRunMain(aCase.mCommand, mDir.path(), aEnv).mExitStatus, aCase.mExit);
    EXPECT_TRUE(tlrxNamesCode(error(), aCase.mCode)) << error();
    EXPECT_TRUE(tlrxContains(error(), aCase.mNamed)) << error();
  }
  // The last case: the batch folder is known from the environment before the
  // configuration is read, so the status goes where the host looks for it.
  EXPECT_TRUE(tlrxContains(error(), "AN ERROR OCCUR DURING Tellurix INIT  : [783360]")) << error();
  EXPECT_FALSE(tlrxFileExists(mDir.file("Process.log")));
  EXPECT_FALSE(tlrxFileExists(mDir.file("_error")));
  expectLines(workingFile(), {"-1", "host status line", "AN ERROR OCCUR DURING Tellurix INIT  : [783360]", "*"});
}

// A start-up that fails before its configuration is read leaves its status
// files in the batch folder, else the working folder, never in the folder it
// was started from; only an error file without any known folder goes there.
TEST_F(EntryTest, FailedStartUpLeavesNoStrayFilesInTheCurrentFolder) {
  // The folders named, a prepared working file, then what the batch, working
  // and current folders hold afterwards.
  const struct {
    bool mBatch, mWorking, mPrepared;
    std::set<std::string> mHeld[3];
  } aCases[] = {
      {true, true, true, {{"Process.working", "Process.working_error"}, {}, {}}},
      {true, true, false, {{"Process.working_error", "Process.working_tmp"}, {}, {}}},
      {false, true, false, {{}, {"Process.working_error", "Process.working_tmp"}, {}}},
      {false, false, false, {{}, {}, {"_error"}}},
  };
  CTempDir aNoConfiguration;
  for (const auto &aCase : aCases) {
    SCOPED_TRACE(std::to_string(aCase.mBatch) + std::to_string(aCase.mWorking) + std::to_string(aCase.mPrepared));
    CTempDir aFolders[3]; // batch, working, current
    if (aCase.mPrepared)
      tlrxWriteFile(aFolders[0].file("Process.working"), "3\nhost\n");
    EXPECT_EQ(tlrxRunMain("main_ratio#x", aFolders[2].path(),
                          {{"TELLURIX_INIT_DIR", aNoConfiguration.path()},
                           {"TELLURIX_BATCH_DIR", aCase.mBatch ? aFolders[0].path() : ""},
                           {"TELLURIX_WORKING_DIR", aCase.mWorking ? aFolders[1].path() : ""}})
                  .mExitStatus,
              5);
    for (int f = 0; f < 3; ++f)
      EXPECT_EQ(namesIn(aFolders[f].path()), aCase.mHeld[f]) << "folder " << f;
    const int aHolder = aCase.mBatch ? 0 : aCase.mWorking ? 1 : 2;
    expectLines(aFolders[aHolder].file(aHolder == 2 ? "_error" : "Process.working_error"),
                {"-1", "*", "AN ERROR OCCUR DURING Tellurix INIT  : [261122] [EC :261122]"});
    if (aCase.mPrepared)
      expectLines(aFolders[0].file("Process.working"), {"-1"});
  }
}

// Without TELLURIX_INIT_DIR the installation's own etc/tellurix is found.
TEST_F(EntryTest, InstalledLayoutRunsWithItsOwnConfiguration) {
  CTempDir aPrefix;
  const STLRXRun aInstall =
      tlrxRun("/bin/sh", {"-c", "cmake --install " + tlrxBuildDir() + " --prefix " + aPrefix.path()}, mDir.path());
  ASSERT_EQ(aInstall.mExitStatus, 0) << aInstall.mOutput;
  expectLines(aPrefix.path() + "etc/tellurix/Tellurix_configuration.ini",
              {aPrefix.path() + "share/tellurix/key_files/", "*", "./", aPrefix.path() + "bin/"});
  EXPECT_EQ(tlrxRun(aPrefix.path() + "bin/main_features_extraction", {"main_min_and_max_x#"}, mDir.path(),
                    {{"TELLURIX_INIT_DIR", ""}})
                .mExitStatus,
            8);
  EXPECT_TRUE(tlrxContains(log(), "[ERROR ID : 456963]"));
}

// Every command counts its tokens and its listed files before it plans a
// step or writes a file.
TEST_F(CommandTest, TooFewTokensOrFilesRunNothing) {
  image("a", {1, 2, 3, 4}, 2, "01-JAN-2007 00:00:00.000000");
  list({"a"});
  const std::string aList = file("list.txt"), aA = file("a");
  const struct {
    const char *mCommand;
    std::vector<std::string> mTokens;
    std::string mNamed, mAbsent;
  } aCases[] = {
      {"main_ratio#", {"list", "root", "0"}, "", "root_rto"},
      {"main_ratio#", {aList, file("out"), "0", "x", "NO", "0.3"}, "list.txt", "out_rto"},
      {"main_min_and_max#", {"list", "root"}, "list root", "root_min"},
      {"main_min_and_max#", {aList, file("out"), "2", "3", "4", "5", "6", "NO", "0.3"}, "list.txt", "out_min"},
      {"main_texture#", {aA, file("out.img"), "0", "5", "5", "x", "OK"}, "", "out.img"},
      {"main_correlation#", {aA, aA, file("coh"), "-5", "11", "11", "11", "11", "NO", "NO"}, "", "coh_norm"},
  };
  for (const auto &aCase : aCases) {
    SCOPED_TRACE(aCase.mCommand + std::to_string(aCase.mTokens.size()));
    resetWorking();
    expectFailure(runCommand(aCase.mCommand, aCase.mTokens, true), 8, 456962, aCase.mNamed);
    EXPECT_FALSE(tlrxContains(trace(), "Step ("));
    EXPECT_FALSE(tlrxFileExists(file(aCase.mAbsent)));
  }
}
