// The one fixture of the command tests: a working folder with a host's
// working file, list and argument files, test images, traced runs,
// simulated scenes and the error file with its numbered code; and the one
// helper that catches a raised code in-process.
#pragma once

#include "tlrx_errors.h"
#include "tlrx_test_support.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <dirent.h>
#include <functional>
#include <regex>
#include <map>
#include <string>
#include <vector>

inline bool tlrxContains(const std::string &theText, const std::string &thePart) {
  return theText.find(thePart) != std::string::npos;
}

// theText names the numbered code theCode ("[EC :n]").
inline bool tlrxNamesCode(const std::string &theText, int theCode) {
  return tlrxContains(theText, "[EC :" + std::to_string(theCode) + "]");
}

// The numbered code theBody raises, its message into theMessage when asked;
// 0 when it returns normally.
inline int32_t tlrxRaisedCode(const std::function<void()> &theBody, std::string *theMessage = nullptr) {
  try {
    theBody();
  } catch (const CErrorExceptionManager &aError) {
    if (theMessage != nullptr)
      *theMessage = aError.mMessage;
    return aError.mCode;
  }
  return 0;
}

// Every file of theFolder, by name: "name\ncontent", the folder's own path
// in the contents replaced by "T/" (headers name their rasters).
inline std::vector<std::string> tlrxFolderContents(const std::string &theFolder) {
  std::vector<std::string> aNames;
  if (DIR *aDir = opendir(theFolder.c_str())) {
    while (const dirent *aEntry = readdir(aDir))
      if (aEntry->d_name[0] != '.')
        aNames.push_back(aEntry->d_name);
    closedir(aDir);
  }
  std::sort(aNames.begin(), aNames.end());
  for (std::string &aName : aNames)
    aName += "\n" + std::regex_replace(tlrxReadFile(theFolder + aName), std::regex(theFolder), "T/");
  return aNames;
}

// theFolders hold the same files as theReference, byte for byte.
inline void tlrxExpectSameFolders(const std::vector<std::string> &theReference,
                                  const std::vector<std::string> &theOther, const std::string &theWhat) {
  ASSERT_GE(theReference.size(), 1u) << theWhat;
  ASSERT_EQ(theOther.size(), theReference.size()) << theWhat << ": the files written differ";
  for (size_t f = 0; f < theReference.size(); ++f)
    EXPECT_TRUE(theOther[f] == theReference[f]) << theWhat << ": " << theReference[f].substr(0, theReference[f].find('\n'))
                                                << " differs";
}

class CommandTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override {
    tlrxStartLibraryEnvironment(mDir.path());
    resetWorking();
  }
  void resetWorking(const std::string &theStatus = "0") const { tlrxWriteFile(working(), theStatus + "\nhost\n"); }
  std::string file(const std::string &theName) const { return mDir.file(theName); }
  std::string working() const { return file("Process.working"); }
  std::string error() const { return tlrxReadFile(working() + "_error"); }
  std::string log() const { return tlrxReadFile(file("Process.log")); }
  std::string trace() const { return tlrxReadFile(file("Process.trace")); }

  // A test image of theLines lines of theValues.
  void image(const std::string &theName, const std::vector<double> &theValues, int theLines = 1,
             const std::string &theTime = "", bool theHasNull = true, double theNull = -1) const {
    STLRXTestRaster aRaster;
    aRaster.mLines = theLines;
    aRaster.mPixels = static_cast<int>(theValues.size()) / theLines;
    aRaster.mValues = theValues;
    aRaster.mHasNull = theHasNull;
    aRaster.mNull = theNull;
    aRaster.mAcquisitionTime = theTime;
    tlrxWriteTestRaster(file(theName), aRaster);
  }
  std::vector<double> result(const std::string &theName) const { return tlrxReadTestRaster(file(theName)); }

  // The list file "list.txt" of theNames in the folder.
  void list(const std::vector<std::string> &theNames) const {
    std::string aText;
    for (const std::string &aName : theNames)
      aText += file(aName) + "\n";
    tlrxWriteFile(file("list.txt"), aText);
  }

  // Runs theCommand ("main_x#") with an argument file of theTokens after a
  // title line, with tracing on when asked.
  STLRXRun runCommand(const std::string &theCommand, const std::vector<std::string> &theTokens,
                      bool theTracing = false) const {
    std::string aText = "arguments\n";
    for (const std::string &aToken : theTokens)
      aText += aToken + "\n";
    tlrxWriteFile(file("args.txt"), aText);
    std::map<std::string, std::string> aEnv;
    if (theTracing) {
      tlrxWriteConfiguration(mDir.path(), {{12, "ACTIVE"}});
      aEnv["TELLURIX_INIT_DIR"] = mDir.path();
    }
    return tlrxRunMain(theCommand + file("args.txt"), mDir.path(), aEnv);
  }

  // tlrx_simulate with theArgs, in the test folder.
  void simulate(const std::vector<std::string> &theArgs) const {
    const STLRXRun aRun = tlrxRun("tlrx_simulate", theArgs, mDir.path());
    ASSERT_EQ(aRun.mExitStatus, 0) << aRun.mOutput;
  }

  // The run ended with theStatus and the error file names theCode and, when
  // given, theNamed.
  void expectFailure(const STLRXRun &theRun, int theStatus, int theCode, const std::string &theNamed = "") const {
    EXPECT_EQ(theRun.mExitStatus, theStatus) << theRun.mOutput;
    const std::string aError = error();
    EXPECT_TRUE(tlrxNamesCode(aError, theCode)) << aError;
    if (!theNamed.empty())
      EXPECT_TRUE(tlrxContains(aError, theNamed)) << aError;
  }
};

// The text after "aArgv[0]" in theTrace, blanks trimmed: the process name
// the step runner gave the step.
inline std::string tlrxTracedProcessName(const std::string &theTrace) {
  const size_t aStart = theTrace.find("aArgv[0]");
  if (aStart == std::string::npos)
    return "";
  const size_t aEnd = theTrace.find('\n', aStart);
  std::string aName = theTrace.substr(aStart + 8, aEnd - aStart - 8);
  aName.erase(0, aName.find_first_not_of(' '));
  return aName;
}

// Mean of the cells theMargin away from every edge of a lines x pixels raster.
inline double tlrxInteriorMean(const std::vector<double> &theValues, int theLines, int thePixels, int theMargin) {
  double aSum = 0;
  long aCount = 0;
  for (int l = theMargin; l < theLines - theMargin; ++l)
    for (int j = theMargin; j < thePixels - theMargin; ++j) {
      aSum += theValues[static_cast<size_t>(l) * thePixels + j];
      ++aCount;
    }
  return aSum / aCount;
}
