// The runtime in throw mode: start-up configuration, settings, trace and log,
// progress protocol, closing step; error codes against the catalogue and the
// README, exit statuses, the exception record, the error file and warnings.
#include "tlrx_command_test_support.h"
#include "tlrx_enviroment.h"
#include "tlrx_platform.h"

#include <cmath>
#include <csignal>
#include <cstring>
#include <map>
#include <set>
#include <sstream>
#include <sys/stat.h>
#include <unistd.h>

namespace {

std::vector<double> sSleeps;
const std::string sCatalogue = tlrxDataDir() + "/des_files/tlrx_errors_catalog.des";

// The README's exit-status table as the code table makes it ("a-b" for runs
// of codes, each class's meaning from the catalogue's CLASSES block).
std::string tlrxExitStatusTable() {
  std::vector<std::string> aMeanings;
  const std::vector<std::string> aLines = tlrxReadLines(sCatalogue);
  for (size_t i = 2; i < aLines.size() && aLines[i] != "TEXTS"; ++i)
    aMeanings.push_back(aLines[i].substr(aLines[i].find(" , ") + 3));
  std::map<int, std::vector<int32_t>> aByStatus;
  for (const STLRXErrorCode &aEntry : CTLRX_ERROR_CODE_TABLE)
    aByStatus[fdfExitStatus(aEntry.mCode)].push_back(aEntry.mCode);
  std::ostringstream aTable;
  aTable << "| exit status | codes | meaning |\n|---|---|---|\n| 0 | 0 | success |\n";
  for (const auto &[aStatus, aCodes] : aByStatus) {
    aTable << "| " << aStatus << " | ";
    for (size_t i = 0, j = 0; i < aCodes.size(); i = ++j) {
      while (j + 1 < aCodes.size() && aCodes[j + 1] == aCodes[j] + 1)
        ++j;
      aTable << (i > 0 ? ", " : "") << aCodes[i] << (j > i ? "-" + std::to_string(aCodes[j]) : "");
    }
    aTable << " | " << aMeanings.at(static_cast<size_t>(fdfGetPEC(aCodes.front()))) << " |\n";
  }
  return aTable.str();
}

class EnvironmentTest : public CommandTest {
protected:
  TLRXSleepFunction mOldSleep = nullptr;
  void SetUp() override {
    CommandTest::SetUp();
    sSleeps.clear();
    mOldSleep = fdfSetSleepFunction([](double theSeconds) { sSleeps.push_back(theSeconds); });
  }
  void TearDown() override { fdfSetSleepFunction(mOldSleep); }

  // Starts the runtime on a configuration written into the temporary folder.
  void startWith(const std::map<int, std::string> &theLines) {
    tlrxWriteConfiguration(mDir.path(), theLines);
    setenv("TELLURIX_INIT_DIR", mDir.path().c_str(), 1);
    fdfInitEnvironment(true, "banner");
    setenv("TELLURIX_INIT_DIR", tlrxConfigDir().c_str(), 1);
  }
};

} // namespace

TEST_F(EnvironmentTest, SettingsFoldersProcessNameAndConfigurationLines) {
  fdfSetEnvVar("one", "MY_SETTING");
  fdfSetEnvVar("two", "MY_SETTING");
  std::string aValue;
  ASSERT_TRUE(fdfGetEnvVar(aValue, "MY_SETTING"));
  EXPECT_EQ(aValue, "two");
  EXPECT_FALSE(fdfGetEnvVar(aValue, "MY_SETTIN"));
  EXPECT_EQ(tlrxRaisedCode([] { fdfGetRequiredEnvVar("NOT_THERE"); }, &aValue), 783360);
  EXPECT_EQ(aValue, "NOT_THERE");
  EXPECT_EQ(fdfGetRequiredEnvVar("TELLURIX_WORKING_DIR"), mDir.path());
  EXPECT_EQ(fdfGetRequiredEnvVar("TELLURIX_BATCH_DIR"), mDir.path());
  EXPECT_EQ(fdfGetWorkingFilePath(), working());
  EXPECT_STREQ(fdfGetProcessName(), " -");
  fdfSetProcessName(std::string(500, 'n').c_str());
  EXPECT_EQ(std::strlen(fdfGetProcessName()), 80u);
  fdfSetProcessName("a\nb\rc");
  EXPECT_STREQ(fdfGetProcessName(), " a b c");
  // Configuration lines drop a stray last character and "\r"; an overlong one is cut, shifting none.
  startWith({{1, "/keys/x"}, {5, "/maps/\r"}, {11, "MSBF\r"}, {14, "-9999"}});
  EXPECT_EQ(fdfGetRequiredEnvVar("TELLURIX_KEY_FILES_DIR"), "/keys/");
  EXPECT_EQ(fdfGetRequiredEnvVar("TELLURIX_MAP_FILES_DIR"), "/maps/");
  EXPECT_EQ(fdfGetRequiredEnvVar("TELLURIX_DEFAULT_BYTE_ORDER"), "MSBF");
  EXPECT_EQ(fdfGetDummyValue(), -9999.0f);
  EXPECT_EQ(fdfGetDummyValueDouble(), -9999.0);
  startWith({{9, std::string(2000, 'd')}});
  EXPECT_EQ(fdfGetRequiredEnvVar("TELLURIX_OTHER_01_DES_FILES_DIR").size(), 511u);
  EXPECT_EQ(fdfGetRequiredEnvVar("TELLURIX_DEFAULT_BYTE_ORDER"), "LSBF");
  // A NaN dummy value has all exponent and mantissa bits set.
  for (const char *aSetting : {"NaN", "NaNQ-anything"}) {
    fdfSetDummyValue(aSetting);
    EXPECT_TRUE(std::isnan(fdfGetDummyValueDouble()));
    const float aFloat = fdfGetDummyValue();
    uint32_t aBits;
    std::memcpy(&aBits, &aFloat, sizeof aBits);
    EXPECT_EQ(aBits, 0x7fffffffu);
  }
  fdfSetDummyValue("0.25");
  EXPECT_EQ(fdfGetDummyValue(), 0.25f);
}

// Start-up creates a missing working file (and traces it when tracing is
// on) and keeps a prepared one.
TEST_F(EnvironmentTest, TraceOnlyWhenActiveAndStartUpCreatesAMissingWorkingFile) {
  EXPECT_FALSE(fdfIsTracing());
  EXPECT_FALSE(tlrxFileExists(file("Process.trace")));
  std::remove(working().c_str());
  startWith({{12, "ACTIVE"}});
  EXPECT_TRUE(fdfIsTracing());
  EXPECT_TRUE(fdfWorkingFileSeen());
  fdfTraceMessage("hello %d\n", 42);
  fdfCloseTrace();
  EXPECT_EQ(trace().substr(0, 15), "OpenTrace 1  2\n");
  EXPECT_TRUE(tlrxContains(trace(), "hello 42\n"));
  EXPECT_TRUE(tlrxContains(trace(), "fdfInitEnvironment - Not found the working file, created : " + working() + "\n"))
      << trace();
  EXPECT_EQ(tlrxReadFile(working()), "0\n\n");
  for (const char *aSuffix : {"_cerr.txt", "_cout.txt", "_clog.txt"})
    EXPECT_TRUE(tlrxFileExists(file(std::string("Process.trace") + aSuffix))) << aSuffix;
  tlrxWriteFile(working(), "7\nhost\n");
  tlrxStartLibraryEnvironment(mDir.path());
  EXPECT_EQ(tlrxReadFile(working()), "7\nhost\n");
  EXPECT_TRUE(fdfWorkingFileSeen());
}

TEST_F(EnvironmentTest, LogIsBoundedAndBannersListArgumentsLiterallyAndEndTheirTimeLine) {
  EXPECT_TRUE(fdfLogMessage("%s", std::string(60000, 'L').c_str()));
  EXPECT_LT(log().size(), 25000u + 1000u);
  const char *aArgs[] = {"ratio_images", "in%s.raw"};
  fdfStartProcess(aArgs, 2, "Ratio", nullptr);
  fdfStartProcess(nullptr, 0, "Texture", "text with %n and %s\n");
  const std::string aStars(160, '*');
  EXPECT_TRUE(tlrxContains(log(), "\n\n\n" + aStars + "\nSTART :  Ratio  [ Tellurix test banner ]\n"));
  EXPECT_TRUE(tlrxContains(log(), " Parameter 0 (ratio_images)\n Parameter 1 (in%s.raw)\n\n" + aStars));
  EXPECT_TRUE(tlrxContains(log(), "text with %n and %s\n"));
  // The END banner ends the time's line (24 characters) before the stars.
  fdfEndBanner();
  const std::string aLog = log(), aHead = "\n" + aStars + "\nEND : Tellurix test banner  -  ";
  const size_t aAt = aLog.find(aHead);
  ASSERT_NE(aAt, std::string::npos) << aLog;
  EXPECT_EQ(aLog.substr(aAt + aHead.size() + 24), "\n\n" + aStars + "\n\n");
}

TEST_F(EnvironmentTest, ProgressRewritesValueAndTextUnlessUnchangedOrCompleteAndTheHostCanInterrupt) {
  tlrxWriteFile(working(), "5\na rather long host status text\n");
  getAndSetPerc(5, 5, "x");
  getAndSetPerc(5, 100, "x");
  EXPECT_EQ(tlrxReadFile(working()), "5\na rather long host status text\n");
  tlrxWriteFile(working() + "_batch_ok", "");
  getAndSetPerc(5, 42, nullptr);
  EXPECT_EQ(tlrxReadFile(working()), "42\na rather long host status text\n");
  EXPECT_FALSE(tlrxFileExists(working() + "_batch_ok"));
  getAndSetPerc(42, 7, "step");
  EXPECT_EQ(tlrxReadFile(working()), "7\nstep\n");
  EXPECT_TRUE(sSleeps.empty());
  // A host value above 100 interrupts the run.
  tlrxWriteFile(working(), "101\nhost\n");
  EXPECT_EQ(tlrxRaisedCode([] { getAndSetPerc(-1, 0, nullptr); }), 326400);
  EXPECT_EQ(tlrxReadFile(working()), "101\nhost\n");
  tlrxWriteFile(working(), "100\nhost\n");
  EXPECT_EQ(tlrxRaisedCode([] { getAndSetPerc(-1, 0, nullptr); }), 0);
}

// A working file never seen is created at once; one that existed and went
// away during the run is waited for, then created.
TEST_F(EnvironmentTest, MissingWorkingFileIsCreatedWaitingOnlyForOneThatExistedOrInterrupts) {
  ASSERT_EQ(std::remove(working().c_str()), 0);
  getAndSetPerc(-1, 3, "created");
  EXPECT_EQ(sSleeps, std::vector<double>({0, 1, 2, 3, 4, 5, 6, 7, 8, 9}));
  EXPECT_EQ(tlrxReadFile(working()), "3\ncreated\n");
  sSleeps.clear();
  const std::string aOther = file("other.working");
  fdfSetWorkingFilePath(aOther);
  EXPECT_FALSE(fdfWorkingFileSeen());
  getAndSetPerc(-1, 3, "created");
  EXPECT_TRUE(sSleeps.empty());
  EXPECT_EQ(tlrxReadFile(aOther), "3\ncreated\n");
  EXPECT_TRUE(fdfWorkingFileSeen());
  // In a folder that went away, one that existed is retried (10 checks, 10
  // creations), one that never existed tried once; both interrupt the run.
  const std::string aFolder = file("batch");
  for (const bool aExisted : {true, false}) {
    ASSERT_EQ(mkdir(aFolder.c_str(), 0755), 0);
    tlrxWriteFile(aFolder + "/Process.working", "1\nhost\n");
    const std::string aPath = aFolder + (aExisted ? "/Process.working" : "/never.working");
    fdfSetWorkingFilePath(aPath);
    std::remove((aFolder + "/Process.working").c_str());
    rmdir(aFolder.c_str());
    sSleeps.clear();
    std::string aMessage;
    EXPECT_EQ(tlrxRaisedCode([] { getAndSetPerc(-1, 3, nullptr); }, &aMessage), 326400) << aExisted;
    EXPECT_EQ(aMessage, aPath);
    EXPECT_EQ(sSleeps.size(), aExisted ? 20u : 0u) << aExisted;
  }
}

TEST_F(EnvironmentTest, SignalStopsTheRunAtItsNextProgressCheck) {
  for (const auto &[aSignal, aText] : {std::pair<int, const char *>{SIGTERM, "Interrupted by SIGTERM"},
                                       std::pair<int, const char *>{SIGINT, "Interrupted by SIGINT"}}) {
    tlrxStartLibraryEnvironment(mDir.path());
    tlrxWriteFile(working(), "5\nhost\n");
    getAndSetPerc(5, 6, nullptr);
    ASSERT_EQ(std::raise(aSignal), 0);
    // The handler only noted it; the next update checks, even an unchanged one.
    EXPECT_EQ(tlrxReadFile(working()), "6\nhost\n");
    std::string aMessage;
    EXPECT_EQ(tlrxRaisedCode([] { getAndSetPerc(6, 6, nullptr); }, &aMessage), 326400);
    EXPECT_EQ(aMessage, aText);
    EXPECT_EQ(tlrxRaisedCode([] { fdfCheckInterruption(); }), 326400);
    EXPECT_EQ(tlrxReadFile(working()), "6\nhost\n");
  }
  tlrxStartLibraryEnvironment(mDir.path()); // a new start-up forgets an earlier request
  EXPECT_EQ(tlrxRaisedCode([] { getAndSetPerc(6, 7, nullptr); }), 0);
}

TEST_F(EnvironmentTest, CleanEndRemovesTheWorkingFileOrRaises261120AfterThirtyAttempts) {
  fdfEndProcess(0, false, false);
  EXPECT_FALSE(tlrxFileExists(working()));
  ASSERT_EQ(mkdir(working().c_str(), 0755), 0);
  tlrxWriteFile(working() + "/keep", "x");
  EXPECT_EQ(tlrxRaisedCode([] { fdfEndProcess(0, false, false); }), 261120);
  ASSERT_EQ(sSleeps.size(), 30u);
  EXPECT_EQ(sSleeps[9], 0);
  EXPECT_EQ(sSleeps[10], 1);
  EXPECT_EQ(sSleeps[29], 2);
  // Still a folder that can be entered: its mode was never touched.
  const mode_t aMask = umask(0);
  umask(aMask);
  struct stat aStat;
  ASSERT_EQ(stat(working().c_str(), &aStat), 0);
  EXPECT_EQ(aStat.st_mode & 0777, 0755u & ~aMask);
  EXPECT_EQ(tlrxReadFile(working() + "/keep"), "x");
}

TEST(DatedCopies, NameTakesTheFirstFreeCounter) {
  CTempDir aDir;
  auto aFree = [&aDir](const char *thePrefix, const char *theSuffix) {
    return fdfFreeDatedName(aDir.path(), thePrefix, "20260101093000", theSuffix);
  };
  EXPECT_EQ(aFree("Process_", "_log.txt"), aDir.file("Process_20260101093000_log.txt"));
  tlrxWriteFile(aDir.file("Process_20260101093000_log.txt"), "first");
  EXPECT_EQ(aFree("Process_", "_log.txt"), aDir.file("Process_20260101093000_1_log.txt"));
  tlrxWriteFile(aDir.file("Process_20260101093000_1_log.txt"), "second");
  EXPECT_EQ(aFree("Process_", "_log.txt"), aDir.file("Process_20260101093000_2_log.txt"));
  // A dangling link takes its name too: a copy would write through it.
  ASSERT_EQ(symlink(aDir.file("nowhere").c_str(), aDir.file("Process_20260101093000_trace.txt").c_str()), 0);
  EXPECT_EQ(aFree("Process_", "_trace.txt"), aDir.file("Process_20260101093000_1_trace.txt"));
  tlrxWriteFile(aDir.file("Process20260101093000.trace"), "saved");
  EXPECT_EQ(aFree("Process", ".trace"), aDir.file("Process20260101093000_1.trace"));
}

TEST_F(EnvironmentTest, TraceCopiesOfFailedRunsAreAllKeptAndABigLogIsMovedAside) {
  for (int i = 0; i < 3; ++i) {
    tlrxWriteFile(file("Process.trace"), "trace " + std::to_string(i));
    EXPECT_EQ(fdfEndProcess(456963, false, false), 456963);
  }
  const STLRXRun aTraces =
      tlrxRun("/bin/sh", {"-c", "for f in Process_*_trace.txt; do cat $f; echo; done | sort"}, mDir.path());
  EXPECT_EQ(aTraces.mOutput, "trace 0\ntrace 1\ntrace 2\n");
  // A log above one million bytes is moved aside under a log name.
  tlrxWriteFile(file("Process.log"), std::string(1000000, 'x'));
  fdfEndProcess(0, false, false);
  EXPECT_TRUE(tlrxFileExists(file("Process.log")));
  tlrxWriteFile(file("Process.log"), std::string(1000001, 'x'));
  fdfEndProcess(0, false, false);
  EXPECT_FALSE(tlrxFileExists(file("Process.log")));
  const STLRXRun aLogs = tlrxRun("/bin/sh", {"-c", "ls Process_*_log.txt"}, mDir.path());
  EXPECT_EQ(aLogs.mOutput.size(), std::string("Process_20261206101010_log.txt\n").size()) << aLogs.mOutput;
}

// Warnings write their log blocks and count; the count decides only between
// success and the warning status: a run that warned and then failed ends as
// the failure (it used to exit 2).
TEST_F(EnvironmentTest, WarningsWriteTheirLogBlocksAndNeverHideAFailure) {
  fdfResetWarningCount();
  TLRX_SHORT_WARNING(130561, "lines padded");
  TLRX_WARNING(261126, "cannot rename");
  EXPECT_EQ(fdfGetWarningCount(), 2);
  EXPECT_TRUE(tlrxContains(log(), "\n\nWARNING : [ERROR ID : 130561] RASTER OUTPUT WARNING [Raster lines never "
                                  "written were padded with zeros]\n  lines padded \n\n"));
  EXPECT_TRUE(tlrxContains(log(), "\nWARNING : [ERROR ID : 261126]FILE ACCESS ERROR [File cannot be renamed] (cannot "
                                  "rename)"));
  EXPECT_EQ(fdfEndProcess(456963, false, false), 456963);
  EXPECT_EQ(fdfExitStatus(fdfEndProcess(456963, false, false)), 8);
  tlrxWriteFile(working(), "50\nhost\n");
  EXPECT_EQ(fdfEndProcess(0, false, false), CTLRX_WARNING_STATUS);
  fdfResetWarningCount();
  EXPECT_EQ(fdfEndProcess(0, false, false), 0);
}

// A report of code 0 is a success: its own log text, no error block, and the
// working file removed.
TEST_F(EnvironmentTest, ReportOfCodeZeroLogsSuccessAndRemovesTheWorkingFile) {
  fdfResetWarningCount();
  tlrxWriteFile(working(), "50\nhost\n");
  EXPECT_EQ(fdfReportError(CErrorExceptionManager(0, __LINE__, __FILE__, "", "")), 0);
  EXPECT_TRUE(tlrxContains(log(), "\n\nSUCCESSFULL\n\n\n"));
  EXPECT_FALSE(tlrxContains(log(), "[ERROR ID"));
  EXPECT_FALSE(tlrxFileExists(working()));
}

TEST(ErrorCodes, TableAndCatalogueNameTheSameCodesOnce) {
  CErrorCatalogue aCatalogue;
  ASSERT_TRUE(aCatalogue.load(sCatalogue.c_str()));
  std::set<int32_t> aTable;
  std::set<std::string> aNames;
  for (const STLRXErrorCode &aEntry : CTLRX_ERROR_CODE_TABLE) {
    EXPECT_TRUE(aTable.insert(aEntry.mCode).second) << "two names for " << aEntry.mCode;
    EXPECT_TRUE(aNames.insert(aEntry.mName).second) << aEntry.mName;
    const int32_t aPEC = fdfGetPEC(aEntry.mCode), aSEC = fdfGetSEC(aEntry.mCode);
    ASSERT_LT(aPEC, aCatalogue.mPECNbr) << aEntry.mName;
    // A class's own code (SEC -1) has the class text; the others a line of their block.
    EXPECT_LT(aSEC, aCatalogue.mSECNbr[aPEC]) << aEntry.mName << " has no catalogue text";
  }
  for (int32_t aPEC = 0; aPEC < aCatalogue.mPECNbr; ++aPEC)
    for (int32_t aSEC = 0; aSEC < aCatalogue.mSECNbr[aPEC]; ++aSEC)
      EXPECT_EQ(aTable.count(fdfErrorCode(aPEC, aSEC)), 1u) << fdfErrorCode(aPEC, aSEC) << " has no name";
  const std::string aReadme = tlrxExitStatusTable();
  EXPECT_NE(tlrxReadFile(std::string(TLRX_TEST_SOURCE_DIR) + "/README.md").find(aReadme), std::string::npos)
      << "the README's table should read:\n"
      << aReadme;
}

TEST(ErrorCodes, ClassArithmeticAndExitStatusesKeepFailuresVisibleInEightBits) {
  EXPECT_EQ(fdfErrorCode(7, 2), 456963);
  EXPECT_EQ(fdfErrorCode(14, -1), 913920);
  EXPECT_EQ(std::make_pair(fdfGetPEC(65280), fdfGetSEC(65280)), std::make_pair(1, -1));
  EXPECT_EQ(std::make_pair(fdfGetPEC(848646), fdfGetSEC(848646)), std::make_pair(13, 5));
  const std::pair<int32_t, int> aStatuses[] = {{0, 0},       {1, 1},       {65280, 2},   {261122, 5},
                                               {326400, 6},  {456960, 8},  {456963, 8},  {783360, 13},
                                               {848640, 14}, {913920, 15}, {200 * 65280, 125}};
  for (const auto &[aCode, aStatus] : aStatuses)
    EXPECT_EQ(fdfExitStatus(aCode), aStatus) << aCode;
}

TEST_F(EnvironmentTest, CatalogueBlocksInAnyOrderMissingBlockAndEmptyCatalogueFallBack) {
  tlrxWriteFile(file("cat.des"), "3\nCLASSES\nZERO , first\nONE , second\nTWO , third\nTEXTS\nClass zero\nClass one\n"
                                 "Class two\n[ErrorCodeInfo_TWO]\n2\nTwo A\nTwo B\n[ErrorCodeInfo_ZERO]\n1\nZero A\n");
  CErrorCatalogue aCatalogue, aEmpty;
  ASSERT_TRUE(aCatalogue.load(file("cat.des").c_str()));
  EXPECT_EQ(aCatalogue.mPECNbr, 3);
  EXPECT_EQ(aCatalogue.mSECNbr, std::vector<int32_t>({1, 0, 2}));
  const struct {
    const CErrorCatalogue &mCatalogue;
    int32_t mCode;
    const char *mPrimary, *mSecondary; // nullptr: not checked
  } aLookups[] = {{aCatalogue, 65281, "Class one", "GENERIC ERROR WRONG CODE"},
                  {aCatalogue, fdfErrorCode(2, 1), "Class two", "Two B"},
                  {aCatalogue, fdfErrorCode(5, 0), "GENERIC ERROR WRONG CODE", nullptr},
                  {aCatalogue, fdfErrorCode(0, -1), nullptr, ""},
                  {aEmpty, 456963, "AN ERROR OCCUR DURING Tellurix INIT", ""}};
  char aPrimary[CTLRX_MAX_LEN_ERROR_TEXT], aSecondary[CTLRX_MAX_LEN_ERROR_TEXT];
  for (const auto &aLookup : aLookups) {
    fdfLookupErrorTexts(aLookup.mCatalogue, aLookup.mCode, aPrimary, aSecondary);
    if (aLookup.mPrimary != nullptr)
      EXPECT_STREQ(aPrimary, aLookup.mPrimary) << aLookup.mCode;
    if (aLookup.mSecondary != nullptr)
      EXPECT_STREQ(aSecondary, aLookup.mSecondary) << aLookup.mCode;
  }
  fdfErrorFilePrimaryText(aCatalogue, fdfErrorCode(5, 0), aPrimary);
  EXPECT_STREQ(aPrimary, "GENERIC ERROR WRONG CODE  :  326401 [PEC 5]");
  fdfErrorFileSecondaryText(aCatalogue, 65281, aSecondary);
  EXPECT_STREQ(aSecondary, "GENERIC ERROR WRONG CODE  :  65281 [1 : 0]");
  fdfErrorFilePrimaryText(aEmpty, 456963, aPrimary);
  EXPECT_STREQ(aPrimary, "AN ERROR OCCUR DURING Tellurix INIT  : [456963]");
}

TEST_F(EnvironmentTest, MalformedCataloguesAreRejectedAndOverlongLinesCut) {
  for (const char *aText : {"", "abc\n", "5\nCLASSES\nA\nB\n", "1\nC\nA\nT\nText\n[ErrorCodeInfo_A]\n1000\nonly one\n",
                            "-3\nC\n"}) { // no count, no number, counts larger than the file, negative
    tlrxWriteFile(file("bad.des"), aText);
    CErrorCatalogue aCatalogue;
    EXPECT_FALSE(aCatalogue.load(file("bad.des").c_str())) << aText;
    EXPECT_TRUE(aCatalogue.empty());
  }
  const std::string aLong(20000, 'x');
  tlrxWriteFile(file("long.des"), "1\nC\nA\nT\n" + aLong + "\n[ErrorCodeInfo_A]\n1\n" + aLong + "\n");
  CErrorCatalogue aCatalogue;
  ASSERT_TRUE(aCatalogue.load(file("long.des").c_str()));
  EXPECT_EQ(aCatalogue.mPrimaryTexts[0].size(), 10000u);
  EXPECT_EQ(aCatalogue.mSecondaryTexts[0][0].size(), 1025u);
  char aPrimary[CTLRX_MAX_LEN_ERROR_TEXT], aSecondary[CTLRX_MAX_LEN_ERROR_TEXT];
  fdfLookupErrorTexts(aCatalogue, 1, aPrimary, aSecondary);
  EXPECT_EQ(std::strlen(aPrimary), 1025u);
}

TEST_F(EnvironmentTest, ThrowModeCarriesCodeTextsPositionAndContextWithinBounds) {
  fdfSetProcessName("ratio\nstep");
  try {
    TLRX_RAISE(456963, "my message");
    FAIL() << "no exception";
  } catch (const CErrorExceptionManager &aError) {
    EXPECT_EQ(std::make_tuple(aError.mCode, aError.mPrimaryCode, aError.mSecondaryCode), std::make_tuple(456963, 7, 2));
    EXPECT_STREQ(aError.mPrimaryText, "COMMAND PARAMETER ERROR");
    EXPECT_STREQ(aError.mSecondaryText, "Unknown command");
    EXPECT_STREQ(aError.mMessage, "my message");
    EXPECT_STREQ(aError.mContext, " ratio step");
    EXPECT_NE(std::strstr(aError.mFile, "test_runtime_environment.cpp"), nullptr);
    EXPECT_GT(aError.mLine, 0);
  }
  const std::string aHuge(100000, 'm');
  CErrorExceptionManager aError(1, 2, aHuge.c_str(), aHuge.c_str(), aHuge.c_str());
  EXPECT_EQ(std::strlen(aError.mMessage), sizeof aError.mMessage - 1);
  EXPECT_EQ(std::strlen(aError.mFile), sizeof aError.mFile - 1);
  EXPECT_EQ(std::strlen(aError.mContext), sizeof aError.mContext - 1);
}

// The message wraps at 48 characters and stops before 144 (five or fewer left
// are not wrapped); the status becomes -1 (-2 for warnings), with no tail of a
// longer old one; a header in a file error is named in its ".sml" form.
TEST_F(EnvironmentTest, ErrorFileWrapsTheMessageAndRewritesTheWorkingFile) {
  std::string aMessage;
  for (int i = 0; i < 150; ++i)
    aMessage += static_cast<char>('a' + i % 26);
  tlrxWriteFile(working(), "37\nhost text\n");
  fdfWriteErrorFile(261122, aMessage.c_str(), static_cast<const char *>(nullptr));
  const std::string aBlank(66, ' ');
  EXPECT_EQ(tlrxReadLines(working() + "_error"),
            std::vector<std::string>({"-1", "FILE ACCESS ERROR", "File cannot be opened [EC :261122]",
                                      aMessage.substr(0, 48), aMessage.substr(48, 48), aMessage.substr(96, 47), "",
                                      aBlank, aBlank}));
  std::vector<std::string> aWorking = tlrxReadLines(working());
  ASSERT_EQ(aWorking.size(), 10u);
  aWorking.resize(3);
  EXPECT_EQ(aWorking, std::vector<std::string>({"-1", "host text", "FILE ACCESS ERROR"}));
  fdfWriteErrorFile(456960, std::string(52, 'z').c_str(), static_cast<const char *>(nullptr));
  EXPECT_EQ(tlrxReadLines(working() + "_error")[3], std::string(52, 'z'));
  fdfWriteErrorFile(261121, "/data/image_hdr", static_cast<const char *>(nullptr));
  EXPECT_EQ(tlrxReadLines(working() + "_error")[3], "/data/image.sml");
  fdfWriteErrorFile(456960, "/data/image_hdr", static_cast<const char *>(nullptr));
  EXPECT_EQ(tlrxReadLines(working() + "_error")[3], "/data/image_hdr");
  tlrxWriteFile(working(), "37\nhost text\n" + std::string(3000, 'q') + "\n");
  fdfWriteErrorFile(65280, "", static_cast<const char *>(nullptr));
  const std::string aText = tlrxReadFile(working());
  EXPECT_EQ(aText.substr(0, 15), "-2\nhost text\nPR");
  EXPECT_EQ(aText.find('q'), std::string::npos);
  EXPECT_EQ(tlrxReadLines(working() + "_error")[0], "-1");
}

TEST_F(EnvironmentTest, MissingWorkingFileFallsBackToTmpWaitingOnlyForOneThatExisted) {
  const std::pair<const char *, std::vector<double>> aCases[] = {{"Process.working", {0, 1, 2, 3, 4, 5, 6, 7, 8, 9}},
                                                                 {"never.working", {}}};
  for (const auto &[aName, aExpectedSleeps] : aCases) {
    const std::string aPath = file(aName);
    fdfSetWorkingFilePath(aPath);
    std::remove(aPath.c_str()); // the working file goes away during the run
    sSleeps.clear();
    fdfWriteErrorFile(326400, "stopped", static_cast<const char *>(nullptr));
    EXPECT_EQ(sSleeps, aExpectedSleeps) << aName;
    std::vector<std::string> aTmp = tlrxReadLines(aPath + "_tmp");
    aTmp.resize(3);
    EXPECT_EQ(aTmp, std::vector<std::string>({"PROCESSING INTERRUPTED", " [EC :326400]", "stopped"})) << aName;
    EXPECT_FALSE(tlrxFileExists(aPath));
    EXPECT_EQ(tlrxReadLines(aPath + "_error")[3], "stopped");
  }
}

// No folder known: the error file goes to the current folder, where hosts look, and no "_tmp".
TEST_F(EnvironmentTest, WithoutAnyFolderOnlyTheErrorFileGoesToTheCurrentFolder) {
  char aPrevious[4096];
  ASSERT_NE(getcwd(aPrevious, sizeof aPrevious), nullptr);
  ASSERT_EQ(chdir(mDir.path().c_str()), 0);
  fdfSetWorkingFilePath("");
  EXPECT_FALSE(fdfWriteErrorFile(783360, "TELLURIX_DUMMY_VALUE", static_cast<const char *>(nullptr)));
  const bool aTmp = tlrxFileExists(file("_tmp"));
  const std::vector<std::string> aError = tlrxReadLines(file("_error"));
  ASSERT_EQ(chdir(aPrevious), 0);
  EXPECT_FALSE(aTmp);
  ASSERT_GE(aError.size(), 4u);
  EXPECT_EQ(aError[0] + "|" + aError[2] + "|" + aError[3], "-1| [EC :783360]|TELLURIX_DUMMY_VALUE");
}
