// Shared fixture of the texture and correlation command tests: a working
// folder with a host's working file, argument files, traced runs, simulated
// scenes and the error file.
#pragma once

#include "tlrx_test_support.h"

#include <gtest/gtest.h>

#include <map>
#include <string>
#include <vector>

class WindowCommandTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override {
    tlrxStartLibraryEnvironment(mDir.path());
    resetWorking();
  }
  void resetWorking() const { tlrxWriteFile(working(), "0\nhost\n"); }
  std::string file(const std::string &theName) const { return mDir.file(theName); }
  std::string working() const { return mDir.file("Process.working"); }
  std::string error() const { return tlrxReadFile(working() + "_error"); }
  std::string trace() const { return tlrxReadFile(mDir.file("Process.trace")); }

  // Runs theCommand with an argument file of theTokens (after a title line),
  // with tracing on when asked.
  STLRXRun runCommand(const std::string &theCommand, const std::vector<std::string> &theTokens,
                      bool theTracing = false) {
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

  // The error file names theCode and ends its message with theTail.
  void expectError(int theCode, const std::string &theTail = "") const {
    const std::string aError = error();
    EXPECT_NE(aError.find("[EC :" + std::to_string(theCode) + "]"), std::string::npos) << aError;
    if (!theTail.empty())
      EXPECT_NE(aError.find(theTail), std::string::npos) << aError;
  }
};

inline bool tlrxContains(const std::string &theText, const std::string &thePart) {
  return theText.find(thePart) != std::string::npos;
}

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
