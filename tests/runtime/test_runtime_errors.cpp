// Error codes, catalogues, the exception record and the error file.
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_platform.h"
#include "tlrx_test_support.h"

#include <gtest/gtest.h>

#include <cstring>
#include <unistd.h>

namespace {

class ErrorsTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }
  std::string workingFile() const { return mDir.file("Process.working"); }
};

std::string catalogueWithoutClass1Block() {
  return "3\nCLASSES\nZERO , first\nONE , second\nTWO , third\nTEXTS\nClass zero\nClass one\nClass two\n"
         "[ErrorCodeInfo_TWO]\n2\nTwo A\nTwo B\n[ErrorCodeInfo_ZERO]\n1\nZero A\n";
}

void noSleep(double) {}

} // namespace

TEST(ErrorCodes, ArithmeticOfClassesAndSecondaries) {
  EXPECT_EQ(fdfErrorCode(7, 2), 456963);
  EXPECT_EQ(fdfErrorCode(14, -1), 913920);
  EXPECT_EQ(fdfGetPEC(65280), 1);
  EXPECT_EQ(fdfGetSEC(65280), -1);
  EXPECT_EQ(fdfGetPEC(848646), 13);
  EXPECT_EQ(fdfGetSEC(848646), 5);
}

TEST(ErrorCodes, ExitStatusKeepsFailuresVisibleInEightBits) {
  EXPECT_EQ(fdfExitStatus(0), 0);
  EXPECT_EQ(fdfExitStatus(1), 1);
  EXPECT_EQ(fdfExitStatus(65280), 2);
  EXPECT_EQ(fdfExitStatus(261122), 5);
  EXPECT_EQ(fdfExitStatus(326400), 6);
  EXPECT_EQ(fdfExitStatus(456960), 8);
  EXPECT_EQ(fdfExitStatus(456963), 8);
  EXPECT_EQ(fdfExitStatus(783360), 13);
  EXPECT_EQ(fdfExitStatus(848640), 14);
  EXPECT_EQ(fdfExitStatus(913920), 15);
  EXPECT_EQ(fdfExitStatus(200 * 65280), 125);
}

TEST_F(ErrorsTest, CatalogueBlocksInAnyOrderAndMissingBlockFallsBack) {
  tlrxWriteFile(mDir.file("cat.des"), catalogueWithoutClass1Block());
  CErrorCatalogue aCatalogue;
  ASSERT_TRUE(aCatalogue.load(mDir.file("cat.des").c_str()));
  EXPECT_EQ(aCatalogue.mPECNbr, 3);
  EXPECT_EQ(aCatalogue.mSECNbr[0], 1);
  EXPECT_EQ(aCatalogue.mSECNbr[1], 0);
  EXPECT_EQ(aCatalogue.mSECNbr[2], 2);
  char aPrimary[CTLRX_MAX_LEN_ERROR_TEXT], aSecondary[CTLRX_MAX_LEN_ERROR_TEXT];
  fdfLookupErrorTexts(aCatalogue, 65281, aPrimary, aSecondary);
  EXPECT_STREQ(aPrimary, "Class one");
  EXPECT_STREQ(aSecondary, "GENERIC ERROR WRONG CODE");
  fdfLookupErrorTexts(aCatalogue, fdfErrorCode(2, 1), aPrimary, aSecondary);
  EXPECT_STREQ(aPrimary, "Class two");
  EXPECT_STREQ(aSecondary, "Two B");
  fdfLookupErrorTexts(aCatalogue, fdfErrorCode(5, 0), aPrimary, aSecondary);
  EXPECT_STREQ(aPrimary, "GENERIC ERROR WRONG CODE");
  fdfLookupErrorTexts(aCatalogue, fdfErrorCode(0, -1), aPrimary, aSecondary);
  EXPECT_STREQ(aSecondary, "");
  fdfErrorFilePrimaryText(aCatalogue, fdfErrorCode(5, 0), aPrimary);
  EXPECT_STREQ(aPrimary, "GENERIC ERROR WRONG CODE  :  326401 [PEC 5]");
  fdfErrorFileSecondaryText(aCatalogue, 65281, aSecondary);
  EXPECT_STREQ(aSecondary, "GENERIC ERROR WRONG CODE  :  65281 [1 : 0]");
}

TEST_F(ErrorsTest, EmptyCatalogueShowsTheInitText) {
  CErrorCatalogue aEmpty;
  char aPrimary[CTLRX_MAX_LEN_ERROR_TEXT], aSecondary[CTLRX_MAX_LEN_ERROR_TEXT];
  fdfLookupErrorTexts(aEmpty, 456963, aPrimary, aSecondary);
  EXPECT_STREQ(aPrimary, "AN ERROR OCCUR DURING Tellurix INIT");
  EXPECT_STREQ(aSecondary, "");
  fdfErrorFilePrimaryText(aEmpty, 456963, aPrimary);
  EXPECT_STREQ(aPrimary, "AN ERROR OCCUR DURING Tellurix INIT  : [456963]");
}

TEST_F(ErrorsTest, MalformedCataloguesAreRejectedWithoutOverRead) {
  const char *const aBad[] = {
      "",                                                     // no count
      "abc\n",                                                // count not a number
      "5\nCLASSES\nA\nB\n",                                   // count larger than the file
      "1\nC\nA\nT\nText\n[ErrorCodeInfo_A]\n1000\nonly one\n", // block count larger than the file
      "-3\nC\n",                                              // negative count
  };
  for (const char *aText : aBad) {
    tlrxWriteFile(mDir.file("bad.des"), aText);
    CErrorCatalogue aCatalogue;
    EXPECT_FALSE(aCatalogue.load(mDir.file("bad.des").c_str())) << aText;
    EXPECT_TRUE(aCatalogue.empty());
  }
}

TEST_F(ErrorsTest, OverlongCatalogueLinesAreCut) {
  const std::string aLong(20000, 'x');
  tlrxWriteFile(mDir.file("long.des"),
                "1\nC\nA\nT\n" + aLong + "\n[ErrorCodeInfo_A]\n1\n" + aLong + "\n");
  CErrorCatalogue aCatalogue;
  ASSERT_TRUE(aCatalogue.load(mDir.file("long.des").c_str()));
  EXPECT_EQ(aCatalogue.mPrimaryTexts[0].size(), 10000u);
  EXPECT_EQ(aCatalogue.mSecondaryTexts[0][0].size(), 1025u);
  char aPrimary[CTLRX_MAX_LEN_ERROR_TEXT], aSecondary[CTLRX_MAX_LEN_ERROR_TEXT];
  fdfLookupErrorTexts(aCatalogue, 1, aPrimary, aSecondary);
  EXPECT_EQ(std::strlen(aPrimary), 1025u);
}

TEST_F(ErrorsTest, ThrowModeCarriesCodeTextsPositionAndContext) {
  fdfSetProcessName("ratio\nstep");
  try {
    TLRX_RAISE(456963, "my message");
    FAIL() << "no exception";
  } catch (const CErrorExceptionManager &aError) {
    EXPECT_EQ(aError.mCode, 456963);
    EXPECT_EQ(aError.mPrimaryCode, 7);
    EXPECT_EQ(aError.mSecondaryCode, 2);
    EXPECT_STREQ(aError.mPrimaryText, "COMMAND PARAMETER ERROR");
    EXPECT_STREQ(aError.mSecondaryText, "Unknown command");
    EXPECT_STREQ(aError.mMessage, "my message");
    EXPECT_STREQ(aError.mContext, " ratio step");
    EXPECT_NE(std::strstr(aError.mFile, "test_runtime_errors.cpp"), nullptr);
    EXPECT_GT(aError.mLine, 0);
  }
}

TEST_F(ErrorsTest, ExceptionFieldsAreBoundedForOverlongTexts) {
  const std::string aHuge(100000, 'm');
  CErrorExceptionManager aError(1, 2, aHuge.c_str(), aHuge.c_str(), aHuge.c_str());
  EXPECT_EQ(std::strlen(aError.mMessage), sizeof aError.mMessage - 1);
  EXPECT_EQ(std::strlen(aError.mFile), sizeof aError.mFile - 1);
  EXPECT_EQ(std::strlen(aError.mContext), sizeof aError.mContext - 1);
}

TEST_F(ErrorsTest, ErrorFileWrapsA150CharacterMessageAt48AndStopsBefore144) {
  std::string aMessage;
  for (int i = 0; i < 150; ++i)
    aMessage += static_cast<char>('a' + i % 26);
  tlrxWriteFile(workingFile(), "37\nhost text\n");
  fdfWriteErrorFile(261122, aMessage.c_str(), static_cast<const char *>(nullptr));
  const std::vector<std::string> aLines = tlrxReadLines(workingFile() + "_error");
  ASSERT_EQ(aLines.size(), 9u);
  EXPECT_EQ(aLines[0], "-1");
  EXPECT_EQ(aLines[1], "FILE ACCESS ERROR");
  EXPECT_EQ(aLines[2], "File cannot be opened [EC :261122]");
  EXPECT_EQ(aLines[3], aMessage.substr(0, 48));
  EXPECT_EQ(aLines[4], aMessage.substr(48, 48));
  EXPECT_EQ(aLines[5], aMessage.substr(96, 47));
  EXPECT_EQ(aLines[6], "");
  EXPECT_EQ(aLines[7], std::string(66, ' '));
  EXPECT_EQ(aLines[8], std::string(66, ' '));
  const std::vector<std::string> aWorking = tlrxReadLines(workingFile());
  ASSERT_EQ(aWorking.size(), 10u);
  EXPECT_EQ(aWorking[0], "-1");
  EXPECT_EQ(aWorking[1], "host text");
  EXPECT_EQ(aWorking[2], "FILE ACCESS ERROR");
}

TEST_F(ErrorsTest, ShortMessageWithFiveOrFewerRemainingIsNotWrapped) {
  const std::string aMessage(52, 'z'); // 4 characters after position 48
  tlrxWriteFile(workingFile(), "1\nx\n");
  fdfWriteErrorFile(456960, aMessage.c_str(), static_cast<const char *>(nullptr));
  EXPECT_EQ(tlrxReadLines(workingFile() + "_error")[3], aMessage);
}

TEST_F(ErrorsTest, HeaderSuffixBecomesSmlForFileErrorsOnly) {
  tlrxWriteFile(workingFile(), "1\nx\n");
  fdfWriteErrorFile(261121, "/data/image_hdr", static_cast<const char *>(nullptr));
  EXPECT_EQ(tlrxReadLines(workingFile() + "_error")[3], "/data/image.sml");
  fdfWriteErrorFile(456960, "/data/image_hdr", static_cast<const char *>(nullptr));
  EXPECT_EQ(tlrxReadLines(workingFile() + "_error")[3], "/data/image_hdr");
}

TEST_F(ErrorsTest, WarningStatusIsMinusTwoAndShorterStatusLeavesNoTail) {
  tlrxWriteFile(workingFile(), "37\nhost text\n" + std::string(3000, 'q') + "\n");
  fdfWriteErrorFile(65280, "", static_cast<const char *>(nullptr));
  const std::string aText = tlrxReadFile(workingFile());
  EXPECT_EQ(aText.substr(0, 15), "-2\nhost text\nPR");
  EXPECT_EQ(aText.find('q'), std::string::npos);
  EXPECT_EQ(tlrxReadLines(workingFile() + "_error")[0], "-1");
}

TEST_F(ErrorsTest, MissingWorkingFileFallsBackToTmpWaitingOnlyForOneThatExisted) {
  static std::vector<double> sSleeps;
  struct SCase {
    const char *mName;
    bool mExisted;
    std::vector<double> mSleeps;
  };
  const SCase aCases[] = {{"Process.working", true, {0, 1, 2, 3, 4, 5, 6, 7, 8, 9}}, {"never.working", false, {}}};
  for (const SCase &aCase : aCases) {
    const std::string aPath = mDir.file(aCase.mName);
    fdfSetWorkingFilePath(aPath);
    // Start-up created Process.working; it goes away during the run.
    std::remove(aPath.c_str());
    sSleeps.clear();
    TLRXSleepFunction aOld = fdfSetSleepFunction([](double theSeconds) { sSleeps.push_back(theSeconds); });
    fdfWriteErrorFile(326400, "stopped", static_cast<const char *>(nullptr));
    fdfSetSleepFunction(aOld);
    EXPECT_EQ(sSleeps, aCase.mSleeps) << aCase.mName;
    const std::vector<std::string> aTmp = tlrxReadLines(aPath + "_tmp");
    ASSERT_GE(aTmp.size(), 3u) << aCase.mName;
    EXPECT_EQ(aTmp[0], "PROCESSING INTERRUPTED");
    EXPECT_EQ(aTmp[1], " [EC :326400]");
    EXPECT_EQ(aTmp[2], "stopped");
    EXPECT_FALSE(tlrxFileExists(aPath));
    EXPECT_EQ(tlrxReadLines(aPath + "_error")[3], "stopped");
  }
}

// No batch or working folder known: the error file keeps the current
// folder, where hosts look for it, and no "_tmp" is left there.
TEST_F(ErrorsTest, WithoutAnyFolderOnlyTheErrorFileGoesToTheCurrentFolder) {
  char aPrevious[4096];
  ASSERT_NE(getcwd(aPrevious, sizeof aPrevious), nullptr);
  ASSERT_EQ(chdir(mDir.path().c_str()), 0);
  fdfSetWorkingFilePath("");
  EXPECT_FALSE(fdfWriteErrorFile(783360, "TELLURIX_DUMMY_VALUE", static_cast<const char *>(nullptr)));
  const bool aTmp = tlrxFileExists(mDir.file("_tmp"));
  const std::vector<std::string> aError = tlrxReadLines(mDir.file("_error"));
  ASSERT_EQ(chdir(aPrevious), 0);
  EXPECT_FALSE(aTmp);
  ASSERT_GE(aError.size(), 4u);
  EXPECT_EQ(aError[0], "-1");
  EXPECT_EQ(aError[2], " [EC :783360]");
  EXPECT_EQ(aError[3], "TELLURIX_DUMMY_VALUE");
}

TEST_F(ErrorsTest, WarningsWriteTheirLogBlocksAndCount) {
  fdfResetWarningCount();
  TLRX_SHORT_WARNING(130561, "lines padded");
  TLRX_WARNING(261126, "cannot rename");
  EXPECT_EQ(fdfGetWarningCount(), 2);
  const std::string aLog = tlrxReadFile(mDir.file("Process.log"));
  EXPECT_NE(aLog.find("\n\nWARNING : [ERROR ID : 130561] RASTER OUTPUT WARNING [Raster lines never written were "
                      "padded with zeros]\n  lines padded \n\n"),
            std::string::npos);
  EXPECT_NE(aLog.find("\nWARNING : [ERROR ID : 261126]FILE ACCESS ERROR [File cannot be renamed] (cannot rename)"),
            std::string::npos);
  fdfResetWarningCount();
}
