// Start-up configuration, settings table, trace and log, progress protocol
// and the closing step, in throw mode.
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_platform.h"
#include "tlrx_test_support.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstdlib>
#include <cstring>
#include <sys/stat.h>

namespace {

std::vector<double> theSleeps;
void recordSleep(double theSeconds) { theSleeps.push_back(theSeconds); }

class EnvironmentTest : public ::testing::Test {
protected:
  CTempDir mDir;
  TLRXSleepFunction mOldSleep = nullptr;
  void SetUp() override {
    tlrxStartLibraryEnvironment(mDir.path());
    theSleeps.clear();
    mOldSleep = fdfSetSleepFunction(recordSleep);
  }
  void TearDown() override { fdfSetSleepFunction(mOldSleep); }
  std::string workingFile() const { return mDir.file("Process.working"); }

  // Starts the runtime on a configuration written into the temporary folder.
  void startWith(const std::map<int, std::string> &theLines) {
    tlrxWriteConfiguration(mDir.path(), theLines);
    setenv("TELLURIX_INIT_DIR", mDir.path().c_str(), 1);
    fdfInitEnvironment(true, "banner");
    fdfSetReportAndExit(false);
    setenv("TELLURIX_INIT_DIR", tlrxConfigDir().c_str(), 1);
  }
};

int32_t codeOf(void (*theCall)()) {
  try {
    theCall();
  } catch (const CErrorExceptionManager &aError) {
    return aError.mCode;
  }
  return 0;
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
  EXPECT_TRUE(theSleeps.empty());
}

TEST_F(EnvironmentTest, HostValueAbove100InterruptsTheRun) {
  tlrxWriteFile(workingFile(), "101\nhost\n");
  EXPECT_EQ(codeOf([] { getAndSetPerc(-1, 0, nullptr); }), 326400);
  EXPECT_EQ(tlrxReadFile(workingFile()), "101\nhost\n");
  tlrxWriteFile(workingFile(), "100\nhost\n");
  EXPECT_EQ(codeOf([] { getAndSetPerc(-1, 0, nullptr); }), 0);
}

TEST_F(EnvironmentTest, MissingWorkingFileIsWaitedForThenCreated) {
  getAndSetPerc(-1, 3, "created");
  EXPECT_EQ(theSleeps, std::vector<double>({0, 1, 2, 3, 4, 5, 6, 7, 8, 9}));
  EXPECT_EQ(tlrxReadFile(workingFile()), "3\ncreated\n");
}

TEST_F(EnvironmentTest, UncreatableWorkingFileRaisesInterruption) {
  fdfSetWorkingFilePath(mDir.path() + "no_such_folder/Process.working");
  EXPECT_EQ(codeOf([] { getAndSetPerc(-1, 3, nullptr); }), 326400);
  EXPECT_EQ(theSleeps.size(), 20u);
}

TEST_F(EnvironmentTest, CleanEndRemovesTheWorkingFile) {
  tlrxWriteFile(workingFile(), "50\nhost\n");
  fdfEndProcess(0, false, false);
  EXPECT_FALSE(tlrxFileExists(workingFile()));
}

TEST_F(EnvironmentTest, WorkingFileThatCannotBeRemovedRaises261120AfterThirtyAttempts) {
  mkdir(workingFile().c_str(), 0755);
  tlrxWriteFile(workingFile() + "/keep", "x");
  EXPECT_EQ(codeOf([] { fdfEndProcess(0, false, false); }), 261120);
  EXPECT_EQ(theSleeps.size(), 30u);
  EXPECT_EQ(theSleeps[9], 0);
  EXPECT_EQ(theSleeps[10], 1);
  EXPECT_EQ(theSleeps[29], 2);
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
