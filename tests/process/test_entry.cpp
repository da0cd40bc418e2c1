// The built program run as a host runs it: exit status, log, trace, working
// file and error file.
#include "tlrx_command_test_support.h"
#include "tlrx_test_support.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <csignal>
#include <filesystem>
#include <set>
#include <sys/stat.h>
#include <unistd.h>

namespace {

class EntryTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxWriteFile(workingFile(), "12\nhost status line\n"); }
  std::string workingFile() const { return mDir.file("Process.working"); }
  std::string log() const { return tlrxReadFile(mDir.file("Process.log")); }
  // A configuration of our own in the temporary folder.
  std::map<std::string, std::string> withConfiguration(const std::map<int, std::string> &theLines, int theCount = 14) {
    tlrxWriteConfiguration(mDir.path(), theLines, theCount);
    return {{"TELLURIX_INIT_DIR", mDir.path()}};
  }
  // A simulated series in the folder and the argument file of a ratio over
  // it; returns the command line.
  std::string ratioOverSeries(int theCount, int theSize, const std::string &theTiff) {
    const STLRXRun aSim = tlrxRun("tlrx_simulate",
                                  {"series", "--out", mDir.file("s"), "--count", std::to_string(theCount), "--lines",
                                   std::to_string(theSize), "--pixels", std::to_string(theSize), "--scene", "flat"},
                                  mDir.path());
    EXPECT_EQ(aSim.mExitStatus, 0) << aSim.mOutput;
    tlrxWriteFile(mDir.file("args.txt"), "ratio\n" + mDir.file("s_list.txt") + "\n" + mDir.file("ratio") +
                                             "\n0\nunused\n" + theTiff + "\n0.3\n");
    return "main_ratio#" + mDir.file("args.txt");
  }
  // The progress in the working file, -1 while it cannot be read as one.
  int progress() const {
    const std::vector<std::string> aLines = tlrxReadLines(workingFile());
    return aLines.size() >= 2 && !aLines[0].empty() ? std::atoi(aLines[0].c_str()) : -1;
  }
};

std::set<std::string> namesIn(const std::string &theDir) {
  std::set<std::string> aNames;
  for (const auto &aEntry : std::filesystem::directory_iterator(theDir))
    aNames.insert(aEntry.path().filename().string());
  return aNames;
}

bool contains(const std::string &theText, const std::string &thePart) {
  return theText.find(thePart) != std::string::npos;
}

} // namespace

TEST_F(EntryTest, UnknownCommandReportsEverywhere) {
  const STLRXRun aRun = tlrxRunMain("main_principal_component_analysis#x", mDir.path());
  EXPECT_EQ(aRun.mExitStatus, 8);
  const std::vector<std::string> aError = tlrxReadLines(workingFile() + "_error");
  ASSERT_GE(aError.size(), 3u);
  EXPECT_EQ(aError[0], "-1");
  EXPECT_EQ(aError[1], "COMMAND PARAMETER ERROR");
  EXPECT_EQ(aError[2], "Unknown command [EC :456963]");
  const std::vector<std::string> aWorking = tlrxReadLines(workingFile());
  ASSERT_GE(aWorking.size(), 4u);
  EXPECT_EQ(aWorking[0], "-1");
  EXPECT_EQ(aWorking[1], "host status line");
  EXPECT_EQ(aWorking[3], "Unknown command [EC :456963]");
  const std::string aLog = log();
  EXPECT_TRUE(contains(aLog, "[ERROR ID : 456963]\n  COMMAND PARAMETER ERROR [Unknown command]\n   \n\n"));
  EXPECT_TRUE(contains(aLog, "\nERROR :\n   \n\n"));
  EXPECT_TRUE(contains(aLog, "\nEND : Tellurix Feature Extraction"));
  EXPECT_FALSE(tlrxFileExists(mDir.file("Process.trace")));
}

TEST_F(EntryTest, PrefixIsCaseSensitiveAndNeedsItsHash) {
  const STLRXRun aUpper = tlrxRunMain("MAIN_RATIO#abc", mDir.path());
  EXPECT_EQ(aUpper.mExitStatus, 8) << aUpper.mOutput;
  EXPECT_EQ(tlrxRunMain("main_ratio", mDir.path()).mExitStatus, 8);
  EXPECT_EQ(tlrxRunMain("", mDir.path()).mExitStatus, 8);
}

TEST_F(EntryTest, TrailerIsCutBeforeMatchingAndTraced) {
  const auto aEnv = withConfiguration({{12, "ACTIVE"}});
  const STLRXRun aRun =
      tlrxRunMain("main_principal_component_analysis#x###Tellurix###main_ratio#y", mDir.path(), aEnv);
  EXPECT_EQ(aRun.mExitStatus, 8);
  const std::string aTrace = tlrxReadFile(mDir.file("Process.trace"));
  EXPECT_TRUE(contains(aTrace, "\nlpCmdLine =main_principal_component_analysis#x\n"));
  EXPECT_TRUE(contains(aTrace, "aCommand =5\n"));
  EXPECT_TRUE(contains(aTrace, "LINE=100"));
  // An error run keeps a dated copy of the trace.
  const STLRXRun aList = tlrxRun("/bin/sh", {"-c", "ls Process_*_trace.txt"}, mDir.path());
  EXPECT_EQ(aList.mExitStatus, 0);
}

TEST_F(EntryTest, ArgumentsAreJoinedIntoOneCommandLine) {
  const auto aEnv = withConfiguration({{12, "ACTIVE"}});
  tlrxRun("main_features_extraction", {"main_texture#a", "b"}, mDir.path(), aEnv);
  EXPECT_TRUE(contains(tlrxReadFile(mDir.file("Process.trace")), "lpCmdLine =main_texture#a b\n"));
}

// The batch folder is known from the environment before the configuration
// is read: the status goes where the host looks for it.
TEST_F(EntryTest, ThirteenLineConfigurationStopsStartUp) {
  const STLRXRun aRun = tlrxRunMain("main_ratio#x", mDir.path(), withConfiguration({}, 13));
  EXPECT_EQ(aRun.mExitStatus, 13);
  const std::string aError = tlrxReadFile(workingFile() + "_error");
  EXPECT_TRUE(contains(aError, "AN ERROR OCCUR DURING Tellurix INIT  : [783360]")) << aError;
  EXPECT_TRUE(contains(aError, "[EC :783360]"));
  EXPECT_TRUE(contains(aError, "TELLURIX_DUMMY_VALUE"));
  EXPECT_FALSE(tlrxFileExists(mDir.file("Process.log")));
  EXPECT_FALSE(tlrxFileExists(mDir.file("_error")));
  const std::vector<std::string> aWorking = tlrxReadLines(workingFile());
  ASSERT_GE(aWorking.size(), 4u);
  EXPECT_EQ(aWorking[0], "-1");
  EXPECT_EQ(aWorking[1], "host status line");
  EXPECT_EQ(aWorking[2], "AN ERROR OCCUR DURING Tellurix INIT  : [783360]");
}

TEST_F(EntryTest, MissingOrShortConfigurationIsANumberedError) {
  CTempDir aEmpty;
  STLRXRun aRun = tlrxRunMain("main_ratio#x", mDir.path(), {{"TELLURIX_INIT_DIR", aEmpty.path()}});
  EXPECT_EQ(aRun.mExitStatus, 5);
  EXPECT_TRUE(contains(tlrxReadFile(workingFile() + "_error"), "[EC :261122]"));
  aRun = tlrxRunMain("main_ratio#x", mDir.path(), withConfiguration({}, 2));
  EXPECT_EQ(aRun.mExitStatus, 13);
  EXPECT_TRUE(contains(tlrxReadFile(workingFile() + "_error"), "TELLURIX_WORKING_DIR"));
}

// A start-up that fails before its configuration is read leaves its status
// files in the batch folder, else the working folder, never in the folder it
// was started from; only an error file without any known folder goes there.
TEST_F(EntryTest, FailedStartUpLeavesNoStrayFilesInTheCurrentFolder) {
  struct SCase {
    const char *mName;
    bool mBatch, mWorking, mPrepared;
    const char *mErrorIn; // "batch", "working" or "current"
    const char *mTmpIn;   // the same, or "" for none
  };
  const SCase aCases[] = {
      {"batch folder, prepared working file", true, true, true, "batch", ""},
      {"batch folder, no working file", true, true, false, "batch", "batch"},
      {"working folder only", false, true, false, "working", "working"},
      {"no folder at all", false, false, false, "current", ""},
  };
  CTempDir aNoConfiguration;
  for (const SCase &aCase : aCases) {
    CTempDir aCurrent, aBatch, aWorking;
    if (aCase.mPrepared)
      tlrxWriteFile(aBatch.file("Process.working"), "3\nhost\n");
    const STLRXRun aRun = tlrxRunMain("main_ratio#x", aCurrent.path(),
                                      {{"TELLURIX_INIT_DIR", aNoConfiguration.path()},
                                       {"TELLURIX_BATCH_DIR", aCase.mBatch ? aBatch.path() : ""},
                                       {"TELLURIX_WORKING_DIR", aCase.mWorking ? aWorking.path() : ""}});
    EXPECT_EQ(aRun.mExitStatus, 5) << aCase.mName;
    const std::pair<const char *, const CTempDir *> aFolders[] = {
        {"batch", &aBatch}, {"working", &aWorking}, {"current", &aCurrent}};
    for (const auto &aFolder : aFolders) {
      const std::string aKind = aFolder.first;
      std::set<std::string> aExpected;
      if (aCase.mPrepared && aKind == "batch")
        aExpected.insert("Process.working");
      if (aKind == aCase.mErrorIn)
        aExpected.insert(aKind == "current" ? "_error" : "Process.working_error");
      if (aKind == aCase.mTmpIn)
        aExpected.insert("Process.working_tmp");
      EXPECT_EQ(namesIn(aFolder.second->path()), aExpected) << aCase.mName << " in the " << aKind << " folder";
    }
    const std::string aError = aCase.mErrorIn == std::string("current")
                                   ? aCurrent.file("_error")
                                   : (aCase.mBatch ? aBatch : aWorking).file("Process.working_error");
    const std::vector<std::string> aLines = tlrxReadLines(aError);
    ASSERT_GE(aLines.size(), 3u) << aCase.mName;
    EXPECT_EQ(aLines[0], "-1");
    EXPECT_EQ(aLines[2], "AN ERROR OCCUR DURING Tellurix INIT  : [261122] [EC :261122]") << aCase.mName;
    if (aCase.mPrepared)
      EXPECT_EQ(tlrxReadLines(aBatch.file("Process.working"))[0], "-1");
  }
}

// A person at a terminal, or a rerun after a success removed the working
// file: nobody prepared it, so the run creates it and never waits for it.
TEST_F(EntryTest, RunWithoutAPreparedWorkingFileCreatesItAndDoesNotWait) {
  struct SCase {
    std::string mCommand;
    int mExitStatus;
  };
  const auto aEnv = withConfiguration({{12, "ACTIVE"}});
  const SCase aCases[] = {{ratioOverSeries(2, 6, "NO"), 0}, {"main_principal_component_analysis#x", 8}};
  for (const SCase &aCase : aCases) {
    std::remove(workingFile().c_str());
    // Waiting for the file would take 45 seconds, and as long again on the
    // error path: far beyond the bound.
    const int aPid = tlrxStart("main_features_extraction", {aCase.mCommand}, mDir.path(), aEnv);
    EXPECT_EQ(tlrxWait(aPid, 30), aCase.mExitStatus) << aCase.mCommand;
    EXPECT_TRUE(contains(tlrxReadFile(mDir.file("Process.trace")),
                         "fdfInitEnvironment - Not found the working file, created : " + workingFile() + "\n"))
        << aCase.mCommand;
    EXPECT_FALSE(tlrxFileExists(workingFile() + "_tmp"));
  }
  // The failed run reported into the file it created.
  const std::vector<std::string> aWorking = tlrxReadLines(workingFile());
  ASSERT_GE(aWorking.size(), 4u);
  EXPECT_EQ(aWorking[0], "-1");
  EXPECT_EQ(aWorking[1], "");
  EXPECT_EQ(aWorking[3], "Unknown command [EC :456963]");
}

TEST_F(EntryTest, RunWithItsOwnWorkingFileRemovesItOnSuccess) {
  const std::string aCommand = ratioOverSeries(2, 6, "NO");
  std::remove(workingFile().c_str());
  const int aPid = tlrxStart("main_features_extraction", {aCommand}, mDir.path());
  ASSERT_EQ(tlrxWait(aPid, 30), 0);
  EXPECT_FALSE(tlrxFileExists(workingFile()));
  EXPECT_TRUE(tlrxFileExists(mDir.file("ratio_rto")));
}

// SIGTERM from a host or SIGINT from a terminal ends the run as the host's
// own interruption does: through the error path, exit status 6.
TEST_F(EntryTest, SignalEndsTheRunAsAnOperatorInterruption) {
  const std::string aCommand = ratioOverSeries(6, 2048, "OK");
  const std::pair<int, std::string> aSignals[] = {{SIGTERM, "SIGTERM"}, {SIGINT, "SIGINT"}};
  for (const auto &aSignal : aSignals) {
    tlrxWriteFile(workingFile(), "0\nhost status line\n");
    std::remove((workingFile() + "_error").c_str());
    const int aPid = tlrxStart("main_features_extraction", {aCommand}, mDir.path());
    // Signal it once it works: its handlers are installed by then.
    bool aWorking = false;
    for (int i = 0; i < 30000 && !aWorking; ++i) {
      aWorking = progress() > 0;
      if (!aWorking)
        usleep(1000);
    }
    ASSERT_TRUE(aWorking) << aSignal.second;
    ASSERT_EQ(kill(aPid, aSignal.first), 0);
    EXPECT_EQ(tlrxWait(aPid, 120), 6) << aSignal.second;
    const std::vector<std::string> aError = tlrxReadLines(workingFile() + "_error");
    ASSERT_GE(aError.size(), 4u) << aSignal.second;
    EXPECT_EQ(aError[0], "-1");
    EXPECT_EQ(aError[1], "PROCESSING INTERRUPTED");
    EXPECT_EQ(aError[2], " [EC :326400]");
    EXPECT_EQ(aError[3], "Interrupted by " + aSignal.second);
    const std::vector<std::string> aStatus = tlrxReadLines(workingFile());
    ASSERT_GE(aStatus.size(), 4u);
    EXPECT_EQ(aStatus[0], "-1");
    EXPECT_EQ(aStatus[1], "host status line");
    EXPECT_EQ(aStatus[3], " [EC :326400]");
    EXPECT_TRUE(contains(log(), "[ERROR ID : 326400]\n  PROCESSING INTERRUPTED []\n  Interrupted by " +
                                    aSignal.second + " \n"));
  }
}

TEST_F(EntryTest, MissingOrMalformedCatalogueIsANumberedError) {
  CTempDir aDes;
  STLRXRun aRun = tlrxRunMain("main_ratio#x", mDir.path(), withConfiguration({{6, aDes.path()}}));
  EXPECT_EQ(aRun.mExitStatus, 5);
  EXPECT_TRUE(contains(tlrxReadFile(workingFile() + "_error"), "[EC :261122]"));
  tlrxWriteFile(aDes.file("tlrx_errors_catalog.des"), "40\nC\nA\n");
  aRun = tlrxRunMain("main_ratio#x", mDir.path(), withConfiguration({{6, aDes.path()}}));
  EXPECT_EQ(aRun.mExitStatus, 5);
  EXPECT_TRUE(contains(tlrxReadFile(workingFile() + "_error"), "[EC :261121]"));
}

TEST_F(EntryTest, UnwritableWorkingFolderEndsWithAFileError) {
  const STLRXRun aRun =
      tlrxRunMain("main_ratio#x", mDir.path(), {{"TELLURIX_WORKING_DIR", mDir.path() + "missing/folder"}});
  EXPECT_EQ(aRun.mExitStatus, 5);
  const std::string aError = tlrxReadFile(workingFile() + "_error");
  EXPECT_TRUE(contains(aError, "[EC :261122]"));
  EXPECT_TRUE(contains(aError, "missing/folder/Process.log"));
}

TEST_F(EntryTest, ClosedStandardStreamsDoNotCaptureFiles) {
  const STLRXRun aRun = tlrxRun("/bin/sh",
                                {"-c", "exec 0<&- 1>&- 2>&-; TELLURIX_WORKING_DIR=" + mDir.path() + " TELLURIX_BATCH_DIR=" +
                                           mDir.path() + " " + tlrxBinPath("main_features_extraction") + " x"},
                                mDir.path());
  EXPECT_EQ(aRun.mExitStatus, 8);
  EXPECT_TRUE(contains(log(), "[ERROR ID : 456963]"));
  EXPECT_TRUE(contains(tlrxReadFile(workingFile() + "_error"), "[EC :456963]"));
}

TEST_F(EntryTest, BatchFolderAndWorkingFileNameFromTheEnvironment) {
  CTempDir aBatch;
  tlrxWriteFile(aBatch.file("job.work"), "0\nhost\n");
  const STLRXRun aRun = tlrxRunMain("bad", mDir.path(),
                                    {{"TELLURIX_BATCH_DIR", aBatch.path()}, {"TELLURIX_WORKING_FILE", "job.work"}});
  EXPECT_EQ(aRun.mExitStatus, 8);
  EXPECT_TRUE(contains(tlrxReadFile(aBatch.file("job.work_error")), "[EC :456963]"));
  EXPECT_EQ(tlrxReadLines(aBatch.file("job.work"))[0], "-1");
  EXPECT_TRUE(tlrxFileExists(mDir.file("Process.log")));
}

TEST_F(EntryTest, InstalledLayoutRunsWithItsOwnConfiguration) {
  CTempDir aPrefix;
  const STLRXRun aInstall =
      tlrxRun("/bin/sh", {"-c", "cmake --install " + tlrxBuildDir() + " --prefix " + aPrefix.path()}, mDir.path());
  ASSERT_EQ(aInstall.mExitStatus, 0) << aInstall.mOutput;
  for (const char *aPath : {"bin/main_features_extraction", "bin/main_delete_file", "etc/tellurix/Tellurix_configuration.ini",
                            "share/tellurix/des_files/tlrx_errors_catalog.des"})
    EXPECT_TRUE(tlrxFileExists(aPrefix.path() + aPath)) << aPath;
  const std::vector<std::string> aConfig = tlrxReadLines(aPrefix.path() + "etc/tellurix/Tellurix_configuration.ini");
  ASSERT_EQ(aConfig.size(), 14u);
  EXPECT_EQ(aConfig[0], aPrefix.path() + "share/tellurix/key_files/");
  EXPECT_EQ(aConfig[2], "./");
  EXPECT_EQ(aConfig[3], aPrefix.path() + "bin/");
  // No TELLURIX_INIT_DIR: the installation's own etc/tellurix is found.
  const STLRXRun aRun = tlrxRun(aPrefix.path() + "bin/main_features_extraction", {"main_min_and_max_x#"}, mDir.path(),
                                {{"TELLURIX_INIT_DIR", ""}});
  EXPECT_EQ(aRun.mExitStatus, 8);
  EXPECT_TRUE(contains(log(), "[ERROR ID : 456963]"));
}

using CommandArgumentsTest = CommandTest;

// Every command counts its tokens and its listed files before it plans a
// step or writes a file.
TEST_F(CommandArgumentsTest, TooFewTokensOrFilesRunNothing) {
  image("a", {1, 2, 3, 4}, 2, "01-JAN-2007 00:00:00.000000");
  list({"a"});
  const std::string aList = file("list.txt"), aA = file("a");
  const struct {
    const char *mCase;
    const char *mCommand;
    std::vector<std::string> mTokens;
    std::string mNamed, mAbsent;
  } aCases[] = {
      {"ratio, three tokens", "main_ratio#", {"list", "root", "0"}, "", "root_rto"},
      {"ratio, one file", "main_ratio#", {aList, file("out"), "0", "x", "NO", "0.3"}, "list.txt", "out_rto"},
      {"min and max, two tokens", "main_min_and_max#", {"list", "root"}, "list root", "root_min"},
      {"min and max, one file", "main_min_and_max#", {aList, file("out"), "2", "3", "4", "5", "6", "NO", "0.3"},
       "list.txt", "out_min"},
      {"texture, seven tokens", "main_texture#", {aA, file("out.img"), "0", "5", "5", "x", "OK"}, "", "out.img"},
      {"correlation, ten tokens", "main_correlation#", {aA, aA, file("coh"), "-5", "11", "11", "11", "11", "NO", "NO"},
       "", "coh_norm"},
  };
  for (const auto &aCase : aCases) {
    SCOPED_TRACE(aCase.mCase);
    resetWorking();
    expectFailure(runCommand(aCase.mCommand, aCase.mTokens, true), 8, 456962, aCase.mNamed);
    EXPECT_FALSE(tlrxContains(trace(), "Step ("));
    EXPECT_FALSE(tlrxFileExists(file(aCase.mAbsent)));
  }
}
