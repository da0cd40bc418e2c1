// File helpers, companions, copies, list and argument files, whole numbers,
// acquisition dates, text forms and the platform layer.
#include "tlrx_command_test_support.h"
#include "tlrx_description_section.h"
#include "tlrx_enviroment.h"
#include "tlrx_generic_utility.h"
#include "tlrx_platform.h"
#include "tlrx_time_man_utility.h"

#include <limits>
#include <regex>
#include <sys/stat.h>
#include <unistd.h>

namespace {

using UtilityTest = CommandTest;
using TLRXLines = std::vector<std::string>;

} // namespace

// Only the token "NotOK" stands for no file: a path that merely contains it
// (a folder "NotOK_runs", a file "scene_NotOK") is an ordinary path.
TEST_F(UtilityTest, ExistFileRejectsEmptyNamesAndTheNotOKToken) {
  ASSERT_EQ(mkdir(file("NotOK_runs").c_str(), 0755), 0);
  const std::pair<std::string, bool> aCases[] = {
      {"", false},        {"NotOK", false}, {file("NotOK_file"), true}, {file("NotOK_runs/a"), true},
      {file("scene_NotOK"), true}, {file("NotOK"), true}, {file("real"), true}, {file("absent"), false}};
  for (const auto &[aName, aExists] : aCases)
    if (aExists)
      tlrxWriteFile(aName, "x");
  char aCurrent[4096];
  ASSERT_NE(getcwd(aCurrent, sizeof aCurrent), nullptr);
  ASSERT_EQ(chdir(mDir.path().c_str()), 0); // even a file of that name in the current folder
  for (const auto &[aName, aExists] : aCases) {
    EXPECT_EQ(fdfExistFile(aName.c_str()), aExists) << "[" << aName << "]";
    EXPECT_EQ(fdfExistDescriptionFile(aName.c_str()), aExists) << "[" << aName << "]";
  }
  ASSERT_EQ(chdir(aCurrent), 0);
  EXPECT_FALSE(fdfExistFile(nullptr));
  EXPECT_EQ(fdfGetFileSize(file("real").c_str()), 1);
}

// List files name one input per line: blank lines, a trailing one above
// all, name no file. Argument files keep theirs (tokens keep positions).
TEST_F(UtilityTest, NameListsSkipBlankLinesArgumentFilesKeepThemLineListsStopAtAComment) {
  const std::pair<const char *, TLRXLines> aCases[] = {
      {"a\nb\n", {"a", "b"}},          {"a\nb\n\n", {"a", "b"}},  {"a\r\n\r\nb\r\n\r\n", {"a", "b"}},
      {"\n  \na\n   \nb\n#c\n\nd\n", {"a", "b"}}, {"  a  \nb", {"a", "b"}}, {"\n\n", {}}};
  for (const auto &[aContent, aNames] : aCases) {
    tlrxWriteFile(file("list.txt"), aContent);
    EXPECT_EQ(fdfReadNameList(file("list.txt").c_str()), aNames) << "[" << aContent << "]";
  }
  tlrxWriteFile(file("args.txt"), "title\nlist\n\nroot\n\n");
  EXPECT_EQ(fdfReadArgumentFile(file("args.txt").c_str()), TLRXLines({"list", "", "root", ""}));
  tlrxWriteFile(file("args.txt"), "title\n/a/one.raw\n/a/two.raw\n");
  EXPECT_EQ(fdfReadArgumentFile((file("args.txt") + "###Tellurix###ignored").c_str()),
            TLRXLines({"/a/one.raw", "/a/two.raw"}));
  tlrxWriteFile(file("one.txt"), "only a title\n");
  std::string aMessage;
  EXPECT_EQ(tlrxRaisedCode([&] { fdfReadArgumentFile(file("one.txt").c_str()); }, &aMessage), 261122);
  EXPECT_EQ(aMessage, file("one.txt"));
  // Line lists stop at a comment, trim, cut overlong lines and look in the working folder.
  tlrxWriteFile(file("list.txt"), "  first  \r\nsecond\n#third\nfourth\n");
  EXPECT_EQ(fdfReadLineList(file("list.txt").c_str(), true), TLRXLines({"first", "second"}));
  EXPECT_EQ(fdfReadLineList("/no/such/folder/list.txt", false), TLRXLines({"  first  ", "second"}));
  EXPECT_EQ(fdfReadLineList("C:\\data\\list.txt", true).size(), 2u);
  EXPECT_EQ(tlrxRaisedCode([] { fdfReadLineList("/no/such/missing.txt", true); }, &aMessage), 261122);
  EXPECT_EQ(aMessage, "/no/such/missing.txt");
  tlrxWriteFile(file("list.txt"), "a\n   \n" + std::string(25000, 'y') + "\nlast");
  EXPECT_EQ(fdfReadLineList(file("list.txt").c_str(), true), TLRXLines({"a", "", std::string(10000, 'y'), "last"}));
}

TEST_F(UtilityTest, DeleteRasterRemovesExistingCompanionsCopyFallsBackToSml) {
  const std::string aRaster = file("scene_slc");
  const char *const aSuffixes[] = {"", "_hdr", ".sml", ".shp.sml", ".hdr", "_hdr_tmp.sml"};
  for (const char *aSuffix : aSuffixes)
    tlrxWriteFile(aRaster + aSuffix, "x");
  for (const char *aName : {"scene.TellurixParameterExtracted.sml", "scene.hdr", "other.sml"})
    tlrxWriteFile(file(aName), "x");
  EXPECT_TRUE(fdfDeleteRaster(aRaster.c_str(), true, true));
  for (const char *aSuffix : aSuffixes)
    EXPECT_FALSE(tlrxFileExists(aRaster + aSuffix)) << aSuffix;
  EXPECT_FALSE(tlrxFileExists(file("scene.TellurixParameterExtracted.sml")));
  EXPECT_FALSE(tlrxFileExists(file("scene.hdr")));
  EXPECT_TRUE(tlrxFileExists(file("other.sml")));
  tlrxWriteFile(file("img"), "x");
  tlrxWriteFile(file("img.sml"), "x");
  EXPECT_FALSE(fdfDeleteRaster(file("img").c_str(), true, false));
  EXPECT_TRUE(tlrxFileExists(file("img")));
  EXPECT_FALSE(tlrxFileExists(file("img.sml")));
  // A copy falls back from "_hdr" to ".sml"; a failure raises 261123 with the system's text.
  tlrxWriteFile(file("in.sml"), "<xml/>");
  tlrxWriteFile(file("out.sml"), "old");
  fdfCopyFile(file("in_hdr").c_str(), file("out_hdr").c_str(), false);
  EXPECT_EQ(tlrxReadFile(file("out.sml")), "<xml/>");
  EXPECT_FALSE(tlrxFileExists(file("out_hdr")));
  std::string aMessage;
  EXPECT_EQ(tlrxRaisedCode([&] { fdfCopyFile(file("none").c_str(), file("dest").c_str(), false); }, &aMessage), 261123);
  EXPECT_EQ(aMessage, "ERROR CODE 2 [No such file or directory];    " + file("none"));
  EXPECT_EQ(tlrxRaisedCode([&] { fdfCopyFile(file("none").c_str(), file("dest").c_str(), true); }), 0);
}

TEST_F(UtilityTest, SpawnedDeleteHelperRemovesDetachedAndRemovalTakesALinkItselfNeverAFolder) {
  const std::string aFile = file("to_delete.tmp");
  tlrxWriteFile(aFile, "x");
  fdfSetEnvVar((tlrxBuildDir() + "/bin/").c_str(), "TELLURIX_EXE_DIR");
  EXPECT_EQ(NTLRX_UTILITY_SpawnDeleteFile(aFile.c_str()), 0);
  for (int i = 0; i < 100 && tlrxFileExists(aFile); ++i)
    usleep(20000);
  EXPECT_FALSE(tlrxFileExists(aFile));
  fdfSetEnvVar("/no/such/dir/", "TELLURIX_EXE_DIR");
  EXPECT_NE(NTLRX_UTILITY_SpawnDeleteFile(aFile.c_str()), 0);
  // Removal in the runtime and by the helper: a file or a link goes (the link
  // itself, its target intact); a folder stays with its mode, and the helper
  // says so. Cases by link target ("": a read-only file, nullptr: a folder).
  const std::pair<const char *, bool> aCases[] = {
      {"", true}, {"target", true}, {"target_dir", true}, {"nowhere", true}, {nullptr, false}};
  tlrxWriteFile(file("target"), "target");
  ASSERT_EQ(chmod(file("target").c_str(), 0444), 0);
  ASSERT_EQ(mkdir(file("target_dir").c_str(), 0750), 0);
  ASSERT_EQ(chmod(file("target_dir").c_str(), 0750), 0);
  const std::string aEntry = file("entry");
  for (const bool aByHelper : {false, true}) {
    for (const auto &[aLink, aRemoved] : aCases) {
      const std::string aKind = aLink == nullptr ? "folder" : aLink;
      if (aLink == nullptr) {
        ASSERT_EQ(mkdir(aEntry.c_str(), 0750), 0);
        ASSERT_EQ(chmod(aEntry.c_str(), 0750), 0);
      } else if (*aLink != '\0') {
        ASSERT_EQ(symlink(file(aLink).c_str(), aEntry.c_str()), 0);
      } else {
        tlrxWriteFile(aEntry, "x");
        ASSERT_EQ(chmod(aEntry.c_str(), 0444), 0);
      }
      if (aByHelper) {
        const STLRXRun aRun = tlrxRun("main_delete_file", {aEntry}, mDir.path());
        EXPECT_EQ(aRun.mExitStatus, aRemoved ? 0 : 1) << aKind;
        EXPECT_EQ(aRun.mOutput, aRemoved ? "" : "main_delete_file: " + aEntry + ": Is a directory\n") << aKind;
      } else {
        EXPECT_EQ(fdfRemoveFile(aEntry.c_str()), aRemoved) << aKind;
      }
      struct stat aStat;
      EXPECT_EQ(lstat(aEntry.c_str(), &aStat) == 0, !aRemoved) << aKind << " helper " << aByHelper;
      if (!aRemoved) {
        EXPECT_EQ(aStat.st_mode & 07777, 0750u) << aKind;
        rmdir(aEntry.c_str());
      }
      ASSERT_EQ(stat(file("target").c_str(), &aStat), 0);
      EXPECT_EQ(aStat.st_mode & 07777, 0444u) << aKind;
      EXPECT_EQ(tlrxReadFile(file("target")), "target");
      ASSERT_EQ(stat(file("target_dir").c_str(), &aStat), 0);
      EXPECT_EQ(aStat.st_mode & 07777, 0750u) << aKind;
    }
  }
}

// The whole text, blanks around it allowed, is the number; a refused text leaves the value alone.
TEST(WholeNumbers, IntegersAreTheWholeTextWithinInt32) {
  const std::pair<const char *, int32_t> aRead[] = {{"30", 30}, {"  -12\t", -12}, {"+7", 7}, {"2147483647", INT32_MAX},
                                                    {"-2147483648", INT32_MIN}, {"007\r\n", 7}};
  for (const auto &[aText, aExpected] : aRead) {
    int32_t aValue = -77;
    EXPECT_TRUE(fdfParseWholeInteger(aText, aValue)) << "[" << aText << "]";
    EXPECT_EQ(aValue, aExpected) << "[" << aText << "]";
  }
  for (const char *aText : {"30 junk", "16e1", "7abc", "7.9", "4294967303", "2147483648", "-2147483649",
                            "99999999999999999999", "", "   ", "garbage", "0x10", "- 5", "\v5", "5 5"}) {
    int32_t aValue = -77;
    EXPECT_FALSE(fdfParseWholeInteger(aText, aValue)) << "[" << aText << "]";
    EXPECT_EQ(aValue, -77) << "[" << aText << "] left untouched when refused";
  }
  int32_t aValue = 0;
  EXPECT_FALSE(fdfParseWholeInteger(nullptr, aValue));
}

TEST(WholeNumbers, RealsAreTheWholeTextWithoutOverflow) {
  constexpr double aInf = std::numeric_limits<double>::infinity();
  const struct {
    const char *mText;
    bool mFinite, mRead;
    double mValue;
  } aCases[] = {
      {"0.25", true, true, 0.25}, {" -1e3 ", true, true, -1000.0}, {"16e1", true, true, 160.0},
      {"1e-400", true, true, 0.0}, {"inf", false, true, aInf},     {"-Infinity", false, true, -aInf},
      {"inf", true, false, 0},    {"nan", true, false, 0},        {"1e999", false, false, 0},
      {"-1e999", false, false, 0}, {"0.3x", true, false, 0},      {"garbage", false, false, 0},
      {"", false, false, 0},      {" ", false, false, 0},         {"1 2", false, false, 0},
      {"1,5", false, false, 0},   {nullptr, false, false, 0}};
  for (const auto &aCase : aCases) {
    const std::string aName = aCase.mText ? aCase.mText : "null";
    double aValue = -77.0;
    EXPECT_EQ(fdfParseWholeDouble(aCase.mText, aValue, aCase.mFinite), aCase.mRead) << "[" << aName << "] finite "
                                                                                     << aCase.mFinite;
    EXPECT_EQ(aValue, aCase.mRead ? aCase.mValue : -77.0) << "[" << aName << "]";
  }
}

TEST(AcquisitionDate, ParsesOneDigitDaysAndBlanksAsZerosAndOrdersByDayThenSeconds) {
  const struct {
    const char *mText, *mDateText;
    long mDay;
    double mSeconds;
  } aCases[] = {{"05-MAR-2004 09:30:15.500000", "2004-03-05 09:30:15", 12482, 34215.5},
                {"5-MAR-2004 09:30:15.500000", "2004-03-05 09:30:15", 12482, 34215.5},
                {" 5-MAR-2004  9: 0: 5", "2004-03-05 09:00:05", 12482, 32405},
                {"01-JAN-1970 00:00:00.000000", "1970-01-01 00:00:00", 0, 0},
                {"29-FEB-2000 00:00:00", "2000-02-29 00:00:00", 11016, 0}};
  for (const auto &aCase : aCases) {
    STLRXDate aDate;
    ASSERT_TRUE(fdfParseAcquisitionDate(aCase.mText, aDate)) << aCase.mText;
    EXPECT_EQ(fdfDateText(aDate), aCase.mDateText);
    EXPECT_EQ(aDate.mDay, aCase.mDay) << aCase.mText;
    EXPECT_DOUBLE_EQ(aDate.mSeconds, aCase.mSeconds) << aCase.mText;
  }
  STLRXDate aDate;
  for (const char *aText : {"", "05-Mar-2004 09:30:15", "05-MAR-1969 00:00:00", "05-MAR-2101 00:00:00",
                            "31-APR-2004 00:00:00", "00-MAR-2004 00:00:00", "29-FEB-2001 00:00:00", "05/MAR/2004",
                            "xx-MAR-2004 00:00:00", "05-MAR-20a4 00:00:00"})
    EXPECT_FALSE(fdfParseAcquisitionDate(aText, aDate)) << aText;
  STLRXDate aEarly, aLate;
  fdfParseAcquisitionDate("31-DEC-2007 23:59:59.000000", aEarly);
  fdfParseAcquisitionDate("01-JAN-2008 00:00:00.000000", aLate);
  EXPECT_TRUE(fdfDateBefore(aEarly, aLate));
  EXPECT_FALSE(fdfDateBefore(aLate, aEarly));
  EXPECT_FALSE(fdfDateBefore(aEarly, aEarly));
}

TEST(UtilityText, IntegersTimeStampsSwitchAndPlatformLayer) {
  for (long aValue : {0L, 32000L, 32001L, 1000007L, -5L})
    EXPECT_EQ(fdfIntToText(aValue), std::to_string(aValue));
  EXPECT_TRUE(std::regex_match(fdfGetTimeStamp(), std::regex("20[0-9]{12}")));
  EXPECT_TRUE(std::regex_match(fdfGetTimeStamp(true), std::regex("20[0-9]{12}\\.[0-9]{6}")));
  EXPECT_TRUE(std::regex_match(fdfGetCalendarTime(),
                               std::regex("[0-9]{2}-[A-Z][a-z]{2}-20[0-9]{2} [0-9]{2}:[0-9]{2}:[0-9]{2}\\.[0-9]{6}")));
  EXPECT_EQ(fdfGetAscTime().size(), 25u);
  EXPECT_EQ(fdfGetAscTime().back(), '\n');
  EXPECT_TRUE(fdfIsSwitchOn("OK"));
  EXPECT_FALSE(fdfIsSwitchOn("OK "));
  // The platform layer: paths split at both separators, memory status, wall clock.
  std::string aDir, aName, aExt;
  fdfSplitPath("C:\\data/sub\\image.raw", aDir, aName, aExt);
  EXPECT_EQ(aDir + "|" + aName + "|" + aExt, "C:\\data/sub\\|image|.raw");
  fdfSplitPath("plain", aDir, aName, aExt);
  EXPECT_EQ(aDir + "|" + aName + "|" + aExt, "|plain|");
  const STLRXMemoryStatus aStatus = fdfReadMemoryStatus();
  EXPECT_GT(aStatus.mTotalPhys, 0u);
  EXPECT_LE(aStatus.mAvailPhys, aStatus.mTotalPhys);
  const long long aStart = fdfProcessClock();
  usleep(20000);
  EXPECT_GE(fdfProcessClock() - aStart, 15); // wall clock, not CPU time
}
