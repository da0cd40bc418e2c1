// Start-up configuration, settings table, trace and log, progress protocol
// and the closing step, in throw mode.
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_platform.h"
#include "tlrx_description_test_support.h"
#include "tlrx_test_support.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <sys/stat.h>
#include <unistd.h>

namespace {

std::vector<double> sSleeps;
void recordSleep(double theSeconds) { sSleeps.push_back(theSeconds); }

class EnvironmentTest : public ::testing::Test {
protected:
  CTempDir mDir;
  TLRXSleepFunction mOldSleep = nullptr;
  void SetUp() override {
    tlrxStartLibraryEnvironment(mDir.path());
    sSleeps.clear();
    mOldSleep = fdfSetSleepFunction(recordSleep);
  }
  void TearDown() override { fdfSetSleepFunction(mOldSleep); }
  std::string workingFile() const { return mDir.file("Process.working"); }

  // Starts the runtime on a configuration written into the temporary folder.
  void startWith(const std::map<int, std::string> &theLines) {
    tlrxWriteConfiguration(mDir.path(), theLines);
    setenv("TELLURIX_INIT_DIR", mDir.path().c_str(), 1);
    fdfInitEnvironment(true, "banner");
    setenv("TELLURIX_INIT_DIR", tlrxConfigDir().c_str(), 1);
  }
};

mode_t currentUmask() {
  const mode_t aMask = umask(0);
  umask(aMask);
  return aMask;
}

// Names in theDir that match prefix*suffix, sorted.
std::vector<std::string> namesLike(const std::string &theDir, const std::string &thePrefix,
                                   const std::string &theSuffix) {
  std::vector<std::string> aNames;
  for (const auto &aEntry : std::filesystem::directory_iterator(theDir)) {
    const std::string aName = aEntry.path().filename().string();
    if (aName.size() >= thePrefix.size() + theSuffix.size() && aName.compare(0, thePrefix.size(), thePrefix) == 0 &&
        aName.compare(aName.size() - theSuffix.size(), theSuffix.size(), theSuffix) == 0)
      aNames.push_back(aName);
  }
  std::sort(aNames.begin(), aNames.end());
  return aNames;
}

} // namespace

TEST_F(EnvironmentTest, SettingsTableStoresReplacesAndReportsMissing) {
  fdfSetEnvVar("one", "MY_SETTING");
  fdfSetEnvVar("two", "MY_SETTING");
  std::string aValue;
  ASSERT_TRUE(fdfGetEnvVar(aValue, "MY_SETTING"));
  EXPECT_EQ(aValue, "two");
  EXPECT_FALSE(fdfGetEnvVar(aValue, "MY_SETTIN"));
  try {
    fdfGetRequiredEnvVar("NOT_THERE");
    FAIL();
  } catch (const CErrorExceptionManager &aError) {
    EXPECT_EQ(aError.mCode, 783360);
    EXPECT_STREQ(aError.mMessage, "NOT_THERE");
  }
}

TEST_F(EnvironmentTest, WorkingAndBatchFoldersComeFromTheEnvironment) {
  EXPECT_EQ(fdfGetRequiredEnvVar("TELLURIX_WORKING_DIR"), mDir.path());
  EXPECT_EQ(fdfGetRequiredEnvVar("TELLURIX_BATCH_DIR"), mDir.path());
  EXPECT_EQ(fdfGetWorkingFilePath(), workingFile());
  EXPECT_EQ(std::string(fdfGetProcessName()), " -");
}

TEST_F(EnvironmentTest, ConfigurationLinesDropStrayCharacterAndCarriageReturn) {
  startWith({{1, "/keys/x"}, {5, "/maps/\r"}, {11, "MSBF\r"}, {14, "-9999"}});
  EXPECT_EQ(fdfGetRequiredEnvVar("TELLURIX_KEY_FILES_DIR"), "/keys/");
  EXPECT_EQ(fdfGetRequiredEnvVar("TELLURIX_MAP_FILES_DIR"), "/maps/");
  EXPECT_EQ(fdfGetRequiredEnvVar("TELLURIX_DEFAULT_BYTE_ORDER"), "MSBF");
  EXPECT_EQ(fdfGetDummyValue(), -9999.0f);
  EXPECT_EQ(fdfGetDummyValueDouble(), -9999.0);
}

TEST_F(EnvironmentTest, OverlongConfigurationLineIsCutAndDoesNotShiftTheOthers) {
  startWith({{9, std::string(2000, 'd')}});
  EXPECT_EQ(fdfGetRequiredEnvVar("TELLURIX_OTHER_01_DES_FILES_DIR").size(), 511u);
  EXPECT_EQ(fdfGetRequiredEnvVar("TELLURIX_DEFAULT_BYTE_ORDER"), "LSBF");
}

TEST_F(EnvironmentTest, NaNDummyValueHasAllExponentAndMantissaBitsSet) {
  for (const char *aSetting : {"NaN", "NaNQ-anything"}) {
    fdfSetDummyValue(aSetting);
    EXPECT_TRUE(std::isnan(fdfGetDummyValue()));
    EXPECT_TRUE(std::isnan(fdfGetDummyValueDouble()));
    float aFloat = fdfGetDummyValue();
    uint32_t aBits;
    std::memcpy(&aBits, &aFloat, sizeof aBits);
    EXPECT_EQ(aBits, 0x7fffffffu);
  }
  fdfSetDummyValue("-9999");
  EXPECT_EQ(fdfGetDummyValueDouble(), -9999.0);
  fdfSetDummyValue("0.25");
  EXPECT_EQ(fdfGetDummyValue(), 0.25f);
}

TEST_F(EnvironmentTest, ProcessNameIsBoundedAndOnOneLine) {
  fdfSetProcessName(std::string(500, 'n').c_str());
  EXPECT_EQ(std::strlen(fdfGetProcessName()), 80u);
  fdfSetProcessName("a\nb\rc");
  EXPECT_STREQ(fdfGetProcessName(), " a b c");
}

TEST_F(EnvironmentTest, TraceOnlyWhenActive) {
  EXPECT_FALSE(fdfIsTracing());
  EXPECT_FALSE(tlrxFileExists(mDir.file("Process.trace")));
  startWith({{12, "ACTIVE"}});
  EXPECT_TRUE(fdfIsTracing());
  fdfTraceMessage("hello %d\n", 42);
  fdfCloseTrace();
  const std::string aTrace = tlrxReadFile(mDir.file("Process.trace"));
  EXPECT_EQ(aTrace.substr(0, 15), "OpenTrace 1  2\n");
  EXPECT_NE(aTrace.find("hello 42\n"), std::string::npos);
  for (const char *aSuffix : {"_cerr.txt", "_cout.txt", "_clog.txt"})
    EXPECT_TRUE(tlrxFileExists(mDir.file(std::string("Process.trace") + aSuffix))) << aSuffix;
}

TEST_F(EnvironmentTest, LogMessagesAreBoundedToTheFormattingBuffer) {
  const std::string aHuge(60000, 'L');
  EXPECT_TRUE(fdfLogMessage("%s", aHuge.c_str()));
  EXPECT_LT(tlrxReadFile(mDir.file("Process.log")).size(), 25000u + 1000u);
}

TEST_F(EnvironmentTest, StartBannerListsArgumentsOrParameterTextLiterally) {
  const char *aArgs[] = {"ratio_images", "in%s.raw"};
  fdfStartProcess(aArgs, 2, "Ratio", nullptr);
  fdfStartProcess(nullptr, 0, "Texture", "text with %n and %s\n");
  const std::string aLog = tlrxReadFile(mDir.file("Process.log"));
  EXPECT_NE(aLog.find("\n\n\n" + std::string(160, '*') + "\nSTART :  Ratio  [ Tellurix test banner ]\n"),
            std::string::npos);
  EXPECT_NE(aLog.find(" Parameter 0 (ratio_images)\n Parameter 1 (in%s.raw)\n\n" + std::string(160, '*')),
            std::string::npos);
  EXPECT_NE(aLog.find("text with %n and %s\n"), std::string::npos);
}


// Guards the END banner's line end after the time: without it the time's own
// line end ran straight into the stars.
TEST_F(EnvironmentTest, EndBannerEndsItsTimeLineBeforeTheStars) {
  fdfEndBanner();
  const std::string aLog = tlrxReadFile(mDir.file("Process.log"));
  const std::string aStars(160, '*');
  const std::string aHead = "\n" + aStars + "\nEND : Tellurix test banner  -  ";
  const size_t aAt = aLog.find(aHead);
  ASSERT_NE(aAt, std::string::npos) << aLog;
  // The calendar form is 24 characters and its line end, then the banner's.
  EXPECT_EQ(aLog.substr(aAt + aHead.size() + 24), "\n\n" + aStars + "\n\n");
}
TEST_F(EnvironmentTest, ProgressUnchangedOrCompleteLeavesTheFileAlone) {
  tlrxWriteFile(workingFile(), "5\nhost\n");
  getAndSetPerc(5, 5, "x");
  getAndSetPerc(5, 100, "x");
  EXPECT_EQ(tlrxReadFile(workingFile()), "5\nhost\n");
}

TEST_F(EnvironmentTest, ProgressRewritesValueAndKeepsOrReplacesTheText) {
  tlrxWriteFile(workingFile(), "5\na rather long host status text\n");
  tlrxWriteFile(workingFile() + "_batch_ok", "");
  getAndSetPerc(5, 42, nullptr);
  EXPECT_EQ(tlrxReadFile(workingFile()), "42\na rather long host status text\n");
  EXPECT_FALSE(tlrxFileExists(workingFile() + "_batch_ok"));
  getAndSetPerc(42, 7, "step");
  EXPECT_EQ(tlrxReadFile(workingFile()), "7\nstep\n");
  EXPECT_TRUE(sSleeps.empty());
}

TEST_F(EnvironmentTest, HostValueAbove100InterruptsTheRun) {
  tlrxWriteFile(workingFile(), "101\nhost\n");
  EXPECT_EQ(tlrxCodeOf([] { getAndSetPerc(-1, 0, nullptr); }), 326400);
  EXPECT_EQ(tlrxReadFile(workingFile()), "101\nhost\n");
  tlrxWriteFile(workingFile(), "100\nhost\n");
  EXPECT_EQ(tlrxCodeOf([] { getAndSetPerc(-1, 0, nullptr); }), 0);
}

TEST_F(EnvironmentTest, StartUpCreatesAMissingWorkingFileAndKeepsAPreparedOne) {
  // SetUp started on a folder without a working file: nobody watches it.
  EXPECT_EQ(tlrxReadFile(workingFile()), "0\n\n");
  EXPECT_TRUE(fdfWorkingFileSeen());
  tlrxWriteFile(workingFile(), "7\nhost\n");
  tlrxStartLibraryEnvironment(mDir.path());
  EXPECT_EQ(tlrxReadFile(workingFile()), "7\nhost\n");
  EXPECT_TRUE(fdfWorkingFileSeen());
}

TEST_F(EnvironmentTest, StartUpTracesTheWorkingFileItCreated) {
  std::remove(workingFile().c_str());
  startWith({{12, "ACTIVE"}});
  fdfCloseTrace();
  const std::string aTrace = tlrxReadFile(mDir.file("Process.trace"));
  EXPECT_NE(aTrace.find("fdfInitEnvironment - Not found the working file, created : " + workingFile() + "\n"),
            std::string::npos)
      << aTrace;
  EXPECT_EQ(tlrxReadFile(workingFile()), "0\n\n");
}

TEST_F(EnvironmentTest, NeverSeenWorkingFileIsCreatedWithoutWaiting) {
  const std::string aOther = mDir.file("other.working");
  fdfSetWorkingFilePath(aOther);
  EXPECT_FALSE(fdfWorkingFileSeen());
  getAndSetPerc(-1, 3, "created");
  EXPECT_TRUE(sSleeps.empty());
  EXPECT_EQ(tlrxReadFile(aOther), "3\ncreated\n");
  EXPECT_TRUE(fdfWorkingFileSeen());
}

// The working file existed (created at start-up) and went away during the run.
TEST_F(EnvironmentTest, VanishedWorkingFileIsWaitedForThenCreated) {
  ASSERT_EQ(std::remove(workingFile().c_str()), 0);
  getAndSetPerc(-1, 3, "created");
  EXPECT_EQ(sSleeps, std::vector<double>({0, 1, 2, 3, 4, 5, 6, 7, 8, 9}));
  EXPECT_EQ(tlrxReadFile(workingFile()), "3\ncreated\n");
}

TEST_F(EnvironmentTest, UncreatableWorkingFileRaisesInterruption) {
  // A file that existed in a folder that went away is retried (10 checks, 10
  // creations); one that never existed is tried once.
  const std::string aFolder = mDir.file("batch");
  for (const bool aExisted : {true, false}) {
    ASSERT_EQ(mkdir(aFolder.c_str(), 0755), 0);
    tlrxWriteFile(aFolder + "/Process.working", "1\nhost\n");
    const std::string aPath = aFolder + (aExisted ? "/Process.working" : "/never.working");
    fdfSetWorkingFilePath(aPath);
    std::remove((aFolder + "/Process.working").c_str());
    rmdir(aFolder.c_str());
    sSleeps.clear();
    std::string aMessage;
    EXPECT_EQ(tlrxCodeOf([] { getAndSetPerc(-1, 3, nullptr); }, &aMessage), 326400) << aExisted;
    EXPECT_EQ(aMessage, aPath);
    EXPECT_EQ(sSleeps.size(), aExisted ? 20u : 0u) << aExisted;
  }
}

TEST_F(EnvironmentTest, SignalStopsTheRunAtItsNextProgressCheck) {
  const std::pair<int, const char *> aSignals[] = {{SIGTERM, "Interrupted by SIGTERM"},
                                                   {SIGINT, "Interrupted by SIGINT"}};
  for (const auto &aSignal : aSignals) {
    tlrxStartLibraryEnvironment(mDir.path());
    tlrxWriteFile(workingFile(), "5\nhost\n");
    getAndSetPerc(5, 6, nullptr);
    ASSERT_EQ(std::raise(aSignal.first), 0);
    // The handler only noted it; the check comes with the next update, even
    // one that leaves the percentage as it is.
    EXPECT_EQ(tlrxReadFile(workingFile()), "6\nhost\n");
    std::string aMessage;
    EXPECT_EQ(tlrxCodeOf([] { getAndSetPerc(6, 6, nullptr); }, &aMessage), 326400);
    EXPECT_EQ(aMessage, aSignal.second);
    EXPECT_EQ(tlrxCodeOf([] { fdfCheckInterruption(); }), 326400);
    EXPECT_EQ(tlrxReadFile(workingFile()), "6\nhost\n");
  }
  // A new start-up forgets an earlier request.
  tlrxStartLibraryEnvironment(mDir.path());
  EXPECT_EQ(tlrxCodeOf([] { getAndSetPerc(6, 7, nullptr); }), 0);
}

TEST_F(EnvironmentTest, CleanEndRemovesTheWorkingFile) {
  tlrxWriteFile(workingFile(), "50\nhost\n");
  fdfEndProcess(0, false, false);
  EXPECT_FALSE(tlrxFileExists(workingFile()));
}

TEST_F(EnvironmentTest, WorkingFileThatCannotBeRemovedRaises261120AfterThirtyAttempts) {
  std::remove(workingFile().c_str()); // the one start-up created
  ASSERT_EQ(mkdir(workingFile().c_str(), 0755), 0);
  tlrxWriteFile(workingFile() + "/keep", "x");
  EXPECT_EQ(tlrxCodeOf([] { fdfEndProcess(0, false, false); }), 261120);
  EXPECT_EQ(sSleeps.size(), 30u);
  EXPECT_EQ(sSleeps[9], 0);
  EXPECT_EQ(sSleeps[10], 1);
  EXPECT_EQ(sSleeps[29], 2);
  // Still a folder that can be entered: its mode was never touched.
  struct stat aStat;
  ASSERT_EQ(stat(workingFile().c_str(), &aStat), 0);
  EXPECT_EQ(aStat.st_mode & 0777, 0755u & ~currentUmask());
  EXPECT_EQ(tlrxReadFile(workingFile() + "/keep"), "x");
}

TEST(DatedCopies, NameTakesTheFirstFreeCounter) {
  CTempDir aDir;
  const std::string aStamp = "20260101093000";
  EXPECT_EQ(fdfFreeDatedName(aDir.path(), "Process_", aStamp, "_log.txt"), aDir.file("Process_20260101093000_log.txt"));
  tlrxWriteFile(aDir.file("Process_20260101093000_log.txt"), "first");
  EXPECT_EQ(fdfFreeDatedName(aDir.path(), "Process_", aStamp, "_log.txt"),
            aDir.file("Process_20260101093000_1_log.txt"));
  tlrxWriteFile(aDir.file("Process_20260101093000_1_log.txt"), "second");
  EXPECT_EQ(fdfFreeDatedName(aDir.path(), "Process_", aStamp, "_log.txt"),
            aDir.file("Process_20260101093000_2_log.txt"));
  // A dangling link takes its name too: a copy would write through it.
  ASSERT_EQ(symlink(aDir.file("nowhere").c_str(), aDir.file("Process_20260101093000_trace.txt").c_str()), 0);
  EXPECT_EQ(fdfFreeDatedName(aDir.path(), "Process_", aStamp, "_trace.txt"),
            aDir.file("Process_20260101093000_1_trace.txt"));
  tlrxWriteFile(aDir.file("Process20260101093000.trace"), "saved");
  EXPECT_EQ(fdfFreeDatedName(aDir.path(), "Process", aStamp, ".trace"), aDir.file("Process20260101093000_1.trace"));
}

TEST_F(EnvironmentTest, TraceCopiesOfFailedRunsAreAllKept) {
  for (int i = 0; i < 3; ++i) {
    tlrxWriteFile(mDir.file("Process.trace"), "trace " + std::to_string(i));
    EXPECT_EQ(fdfEndProcess(456963, false, false), 456963);
  }
  const std::vector<std::string> aCopies = namesLike(mDir.path(), "Process_", "_trace.txt");
  ASSERT_EQ(aCopies.size(), 3u);
  std::vector<std::string> aTexts;
  for (const std::string &aCopy : aCopies)
    aTexts.push_back(tlrxReadFile(mDir.file(aCopy)));
  std::sort(aTexts.begin(), aTexts.end());
  EXPECT_EQ(aTexts, std::vector<std::string>({"trace 0", "trace 1", "trace 2"}));
}

TEST_F(EnvironmentTest, LogAboveOneMillionBytesIsMovedAsideUnderALogName) {
  tlrxWriteFile(mDir.file("Process.log"), std::string(1000000, 'x'));
  fdfEndProcess(0, false, false);
  EXPECT_TRUE(tlrxFileExists(mDir.file("Process.log")));
  tlrxWriteFile(mDir.file("Process.log"), std::string(1000001, 'x'));
  fdfEndProcess(0, false, false);
  EXPECT_FALSE(tlrxFileExists(mDir.file("Process.log")));
  const STLRXRun aList = tlrxRun("/bin/sh", {"-c", "ls Process_*_log.txt"}, mDir.path());
  EXPECT_EQ(aList.mExitStatus, 0) << aList.mOutput;
  EXPECT_EQ(aList.mOutput.size(), std::string("Process_20261206101010_log.txt\n").size());
}

// The warning count decides only between success and the warning status: a
// run that warned and then failed ends as the failure (it used to exit 2).
TEST_F(EnvironmentTest, WarningsNeverHideAFailure) {
  TLRX_WARNING(CTLRX_WARN_LINES_PADDED, "padded");
  EXPECT_EQ(fdfEndProcess(456963, false, false), 456963);
  EXPECT_EQ(fdfExitStatus(fdfEndProcess(456963, false, false)), 8);
  tlrxWriteFile(workingFile(), "50\nhost\n");
  EXPECT_EQ(fdfEndProcess(0, false, false), CTLRX_WARNING_STATUS);
  fdfResetWarningCount();
  EXPECT_EQ(fdfEndProcess(0, false, false), 0);
}
