// The built program run as a host runs it: exit status, log, trace, working
// file and error file.
#include "tlrx_test_support.h"

#include <gtest/gtest.h>

#include <sys/stat.h>

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
};

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

TEST_F(EntryTest, ThirteenLineConfigurationStopsStartUp) {
  const STLRXRun aRun = tlrxRunMain("main_ratio#x", mDir.path(), withConfiguration({}, 13));
  EXPECT_EQ(aRun.mExitStatus, 13);
  const std::string aError = tlrxReadFile(mDir.file("_error"));
  EXPECT_TRUE(contains(aError, "AN ERROR OCCUR DURING Tellurix INIT  : [783360]")) << aError;
  EXPECT_TRUE(contains(aError, "[EC :783360]"));
  EXPECT_TRUE(contains(aError, "TELLURIX_DUMMY_VALUE"));
  EXPECT_FALSE(tlrxFileExists(mDir.file("Process.log")));
  EXPECT_EQ(tlrxReadFile(workingFile()), "12\nhost status line\n");
}

TEST_F(EntryTest, MissingOrShortConfigurationIsANumberedError) {
  CTempDir aEmpty;
  STLRXRun aRun = tlrxRunMain("main_ratio#x", mDir.path(), {{"TELLURIX_INIT_DIR", aEmpty.path()}});
  EXPECT_EQ(aRun.mExitStatus, 5);
  EXPECT_TRUE(contains(tlrxReadFile(mDir.file("_error")), "[EC :261122]"));
  aRun = tlrxRunMain("main_ratio#x", mDir.path(), withConfiguration({}, 2));
  EXPECT_EQ(aRun.mExitStatus, 13);
  EXPECT_TRUE(contains(tlrxReadFile(mDir.file("_error")), "TELLURIX_WORKING_DIR"));
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
