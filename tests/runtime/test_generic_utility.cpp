// File helpers, companions, copies, list and argument files, text forms.
#include "tlrx_description_section.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"
#include "tlrx_platform.h"
#include "tlrx_description_test_support.h"
#include "tlrx_test_support.h"
#include "tlrx_time_man_utility.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <regex>
#include <sys/stat.h>
#include <unistd.h>

namespace {

class UtilityTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }
};

} // namespace

// Only the token "NotOK" stands for no file: a path that merely contains it
// (a folder "NotOK_runs", a file "scene_NotOK") is an ordinary path.
TEST_F(UtilityTest, ExistFileRejectsEmptyNamesAndTheNotOKToken) {
  ASSERT_EQ(mkdir(mDir.file("NotOK_runs").c_str(), 0755), 0);
  struct SCase {
    std::string mName;
    bool mExists;
  } const aCases[] = {
      {"", false},
      {"NotOK", false},
      {mDir.file("NotOK_file"), true},
      {mDir.file("NotOK_runs/a"), true},
      {mDir.file("scene_NotOK"), true},
      {mDir.file("NotOK"), true},
      {mDir.file("real"), true},
      {mDir.file("absent"), false},
  };
  for (const SCase &aCase : aCases)
    if (aCase.mExists)
      tlrxWriteFile(aCase.mName, "x");
  char aCurrent[4096];
  ASSERT_NE(getcwd(aCurrent, sizeof aCurrent), nullptr);
  ASSERT_EQ(chdir(mDir.path().c_str()), 0); // even a file of that name in the current folder
  for (const SCase &aCase : aCases) {
    EXPECT_EQ(fdfExistFile(aCase.mName.c_str()), aCase.mExists) << "[" << aCase.mName << "]";
    EXPECT_EQ(fdfExistDescriptionFile(aCase.mName.c_str()), aCase.mExists) << "[" << aCase.mName << "]";
  }
  ASSERT_EQ(chdir(aCurrent), 0);
  EXPECT_FALSE(fdfExistFile(nullptr));
  EXPECT_EQ(fdfGetFileSize(mDir.file("real").c_str()), 1);
}

// List files name one input per line: blank lines, a trailing one above
// all, name no file. Argument files keep theirs (tokens keep positions).
TEST_F(UtilityTest, NameListsSkipBlankLines) {
  struct SCase {
    const char *mContent;
    std::vector<std::string> mNames;
  } const aCases[] = {
      {"a\nb\n", {"a", "b"}},
      {"a\nb\n\n", {"a", "b"}},
      {"a\r\n\r\nb\r\n\r\n", {"a", "b"}},
      {"\n  \na\n   \nb\n#c\n\nd\n", {"a", "b"}},
      {"  a  \nb", {"a", "b"}},
      {"\n\n", {}},
  };
  for (const SCase &aCase : aCases) {
    tlrxWriteFile(mDir.file("list.txt"), aCase.mContent);
    EXPECT_EQ(fdfReadNameList(mDir.file("list.txt").c_str()), aCase.mNames) << "[" << aCase.mContent << "]";
  }
  tlrxWriteFile(mDir.file("args.txt"), "title\nlist\n\nroot\n\n");
  EXPECT_EQ(fdfReadArgumentFile(mDir.file("args.txt").c_str()), std::vector<std::string>({"list", "", "root", ""}));
}

TEST_F(UtilityTest, DeleteRasterRemovesExistingCompanionsAndSkipsMissingOnes) {
  const std::string aRaster = mDir.file("scene_slc");
  for (const char *aSuffix : {"", "_hdr", ".sml", ".shp.sml", ".hdr", "_hdr_tmp.sml"})
    tlrxWriteFile(aRaster + aSuffix, "x");
  tlrxWriteFile(mDir.file("scene.TellurixParameterExtracted.sml"), "x");
  tlrxWriteFile(mDir.file("scene.hdr"), "x");
  tlrxWriteFile(mDir.file("other.sml"), "x");
  EXPECT_TRUE(fdfDeleteRaster(aRaster.c_str(), true, true));
  for (const char *aSuffix : {"", "_hdr", ".sml", ".shp.sml", ".hdr", "_hdr_tmp.sml"})
    EXPECT_FALSE(tlrxFileExists(aRaster + aSuffix)) << aSuffix;
  EXPECT_FALSE(tlrxFileExists(mDir.file("scene.TellurixParameterExtracted.sml")));
  EXPECT_FALSE(tlrxFileExists(mDir.file("scene.hdr")));
  EXPECT_TRUE(tlrxFileExists(mDir.file("other.sml")));
}

TEST_F(UtilityTest, DeleteRasterCanKeepTheFileItself) {
  tlrxWriteFile(mDir.file("img"), "x");
  tlrxWriteFile(mDir.file("img.sml"), "x");
  EXPECT_FALSE(fdfDeleteRaster(mDir.file("img").c_str(), true, false));
  EXPECT_TRUE(tlrxFileExists(mDir.file("img")));
  EXPECT_FALSE(tlrxFileExists(mDir.file("img.sml")));
}

TEST_F(UtilityTest, CopyFallsBackFromHdrToSml) {
  tlrxWriteFile(mDir.file("in.sml"), "<xml/>");
  tlrxWriteFile(mDir.file("out.sml"), "old");
  fdfCopyFile(mDir.file("in_hdr").c_str(), mDir.file("out_hdr").c_str(), false);
  EXPECT_EQ(tlrxReadFile(mDir.file("out.sml")), "<xml/>");
  EXPECT_FALSE(tlrxFileExists(mDir.file("out_hdr")));
}

TEST_F(UtilityTest, FailedCopyRaises261123WithTheSystemText) {
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { fdfCopyFile(mDir.file("none").c_str(), mDir.file("dest").c_str(), false); }, &aMessage),
            261123);
  EXPECT_EQ(aMessage, "ERROR CODE 2 [No such file or directory];    " + mDir.file("none"));
  EXPECT_EQ(tlrxCodeOf([&] { fdfCopyFile(mDir.file("none").c_str(), mDir.file("dest").c_str(), true); }), 0);
}

TEST_F(UtilityTest, LineListStopsAtCommentTrimsAndFindsTheWorkingFolder) {
  tlrxWriteFile(mDir.file("list.txt"), "  first  \r\nsecond\n#third\nfourth\n");
  std::vector<std::string> aLines = fdfReadLineList(mDir.file("list.txt").c_str(), true);
  EXPECT_EQ(aLines, std::vector<std::string>({"first", "second"}));
  aLines = fdfReadLineList("/no/such/folder/list.txt", false);
  EXPECT_EQ(aLines, std::vector<std::string>({"  first  ", "second"}));
  aLines = fdfReadLineList("C:\\data\\list.txt", true);
  EXPECT_EQ(aLines.size(), 2u);
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([] { fdfReadLineList("/no/such/missing.txt", true); }, &aMessage), 261122);
  EXPECT_EQ(aMessage, "/no/such/missing.txt");
}

TEST_F(UtilityTest, LineListKeepsBlankLinesAndCutsOverlongOnes) {
  tlrxWriteFile(mDir.file("list.txt"), "a\n   \n" + std::string(25000, 'y') + "\nlast");
  const std::vector<std::string> aLines = fdfReadLineList(mDir.file("list.txt").c_str(), true);
  ASSERT_EQ(aLines.size(), 4u);
  EXPECT_EQ(aLines[1], "");
  EXPECT_EQ(aLines[2].size(), 10000u);
  EXPECT_EQ(aLines[3], "last");
}

TEST_F(UtilityTest, ArgumentFileDropsTheFirstLineAndCutsTheTrailer) {
  tlrxWriteFile(mDir.file("args.txt"), "title\n/a/one.raw\n/a/two.raw\n");
  const std::string aArgument = mDir.file("args.txt") + "###Tellurix###ignored";
  EXPECT_EQ(fdfReadArgumentFile(aArgument.c_str()), std::vector<std::string>({"/a/one.raw", "/a/two.raw"}));
  tlrxWriteFile(mDir.file("one.txt"), "only a title\n");
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { fdfReadArgumentFile(mDir.file("one.txt").c_str()); }, &aMessage), 261122);
  EXPECT_EQ(aMessage, mDir.file("one.txt"));
}

TEST(UtilityText, IntegerToTextGivesTheSameDigits) {
  EXPECT_EQ(fdfIntToText(0), "0");
  EXPECT_EQ(fdfIntToText(32000), "32000");
  EXPECT_EQ(fdfIntToText(32001), "32001");
  EXPECT_EQ(fdfIntToText(1000007), "1000007");
  EXPECT_EQ(fdfIntToText(-5), "-5");
}

TEST(UtilityText, TimeStampForms) {
  EXPECT_TRUE(std::regex_match(fdfGetTimeStamp(), std::regex("20[0-9]{12}")));
  EXPECT_TRUE(std::regex_match(fdfGetTimeStamp(true), std::regex("20[0-9]{12}\\.[0-9]{6}")));
  EXPECT_TRUE(std::regex_match(fdfGetCalendarTime(),
                               std::regex("[0-9]{2}-[A-Z][a-z]{2}-20[0-9]{2} [0-9]{2}:[0-9]{2}:[0-9]{2}\\.[0-9]{6}")));
  EXPECT_EQ(fdfGetAscTime().size(), 25u);
  EXPECT_EQ(fdfGetAscTime().back(), '\n');
}

TEST(UtilityText, SwitchIsExactlyOK) {
  EXPECT_TRUE(fdfIsSwitchOn("OK"));
  EXPECT_FALSE(fdfIsSwitchOn("ok"));
  EXPECT_FALSE(fdfIsSwitchOn("OK "));
}

TEST(Platform, SplitPathAcceptsBothSeparators) {
  std::string aDir, aName, aExt;
  fdfSplitPath("C:\\data/sub\\image.raw", aDir, aName, aExt);
  EXPECT_EQ(aDir, "C:\\data/sub\\");
  EXPECT_EQ(aName, "image");
  EXPECT_EQ(aExt, ".raw");
  fdfSplitPath("plain", aDir, aName, aExt);
  EXPECT_EQ(aDir, "");
  EXPECT_EQ(aName, "plain");
  EXPECT_EQ(aExt, "");
}

TEST(Platform, MemoryStatusAndClock) {
  const STLRXMemoryStatus aStatus = fdfReadMemoryStatus();
  EXPECT_GT(aStatus.mTotalPhys, 0u);
  EXPECT_LE(aStatus.mAvailPhys, aStatus.mTotalPhys);
  const long long aStart = fdfProcessClock();
  usleep(20000);
  EXPECT_GE(fdfProcessClock() - aStart, 15); // wall clock, not CPU time
}

TEST_F(UtilityTest, SpawnedDeleteHelperRemovesTheFileDetached) {
  const std::string aFile = mDir.file("to_delete.tmp");
  tlrxWriteFile(aFile, "x");
  fdfSetEnvVar((tlrxBuildDir() + "/bin/").c_str(), "TELLURIX_EXE_DIR");
  EXPECT_EQ(NTLRX_UTILITY_SpawnDeleteFile(aFile.c_str()), 0);
  for (int i = 0; i < 100 && tlrxFileExists(aFile); ++i)
    usleep(20000);
  EXPECT_FALSE(tlrxFileExists(aFile));
  fdfSetEnvVar("/no/such/dir/", "TELLURIX_EXE_DIR");
  EXPECT_NE(NTLRX_UTILITY_SpawnDeleteFile(aFile.c_str()), 0);
}

// The runtime's removal and the deferred-deletion helper treat every kind of
// entry alike: a file or a link goes (the link itself, its target intact,
// mode and all); a folder stays with its mode, and the helper says so.
TEST_F(UtilityTest, RemovalTakesALinkItselfAndNeverAFolder) {
  struct SCase {
    const char *mKind;
    bool mRemoved;
  };
  const SCase aCases[] = {{"read-only file", true}, {"link to a file", true}, {"link to a folder", true},
                          {"dangling link", true},  {"folder", false}};
  tlrxWriteFile(mDir.file("target"), "target");
  ASSERT_EQ(chmod(mDir.file("target").c_str(), 0444), 0);
  ASSERT_EQ(mkdir(mDir.file("target_dir").c_str(), 0750), 0);
  ASSERT_EQ(chmod(mDir.file("target_dir").c_str(), 0750), 0);
  for (const bool aByHelper : {false, true}) {
    for (const SCase &aCase : aCases) {
      const std::string aKind = aCase.mKind;
      const std::string aEntry = mDir.file("entry");
      if (aKind == "read-only file") {
        tlrxWriteFile(aEntry, "x");
        ASSERT_EQ(chmod(aEntry.c_str(), 0444), 0);
      } else if (aKind == "link to a file") {
        ASSERT_EQ(symlink(mDir.file("target").c_str(), aEntry.c_str()), 0);
      } else if (aKind == "link to a folder") {
        ASSERT_EQ(symlink(mDir.file("target_dir").c_str(), aEntry.c_str()), 0);
      } else if (aKind == "dangling link") {
        ASSERT_EQ(symlink(mDir.file("nowhere").c_str(), aEntry.c_str()), 0);
      } else {
        ASSERT_EQ(mkdir(aEntry.c_str(), 0750), 0);
        ASSERT_EQ(chmod(aEntry.c_str(), 0750), 0);
      }
      if (aByHelper) {
        const STLRXRun aRun = tlrxRun("main_delete_file", {aEntry}, mDir.path());
        EXPECT_EQ(aRun.mExitStatus, aCase.mRemoved ? 0 : 1) << aKind;
        EXPECT_EQ(aRun.mOutput, aCase.mRemoved ? "" : "main_delete_file: " + aEntry + ": Is a directory\n") << aKind;
      } else {
        EXPECT_EQ(fdfRemoveFile(aEntry.c_str()), aCase.mRemoved) << aKind;
      }
      struct stat aStat;
      EXPECT_EQ(lstat(aEntry.c_str(), &aStat) == 0, !aCase.mRemoved) << aKind << " helper " << aByHelper;
      if (!aCase.mRemoved) {
        EXPECT_EQ(aStat.st_mode & 07777, 0750u) << aKind;
        rmdir(aEntry.c_str());
      }
      ASSERT_EQ(stat(mDir.file("target").c_str(), &aStat), 0);
      EXPECT_EQ(aStat.st_mode & 07777, 0444u) << aKind;
      EXPECT_EQ(tlrxReadFile(mDir.file("target")), "target");
      ASSERT_EQ(stat(mDir.file("target_dir").c_str(), &aStat), 0);
      EXPECT_EQ(aStat.st_mode & 07777, 0750u) << aKind;
    }
  }
}

