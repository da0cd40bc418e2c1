// Running the window step programs in-process (throw mode) on small rasters
// written into a temporary folder.
#pragma once

#include "tlrx_command_test_support.h"
#include "tlrx_slc_test_support.h"
#include "tlrx_window_reference.h"

#include <gtest/gtest.h>

#include <cmath>
#include <functional>
#include <string>
#include <vector>

class WindowStepTest : public CommandTest {
protected:
  // Writes theImage with no-data pixels set to theNull (NaN-valued pixels stay
  // as they are, to test non-finite input).
  void write(const std::string &theName, const STestImage &theImage, const std::string &theUnits,
             double theNull = -1.0, const std::string &theTime = "") const {
    STLRXTestRaster aRaster{theImage.mLines, theImage.mPixels, {}, "FLOAT", theUnits, true, theNull, theTime};
    for (size_t i = 0; i < theImage.mValues.size(); ++i)
      aRaster.mValues.push_back(theImage.mValid[i] != 0 ? theImage.mValues[i] : theNull);
    tlrxWriteTestRaster(file(theName), aRaster);
  }

  // Runs a step program with theArgs as argv[1..]; returns its status.
  static int run(int (*theStep)(int, char **), const std::vector<std::string> &theArgs) {
    std::vector<std::string> aStrings = {"step"};
    aStrings.insert(aStrings.end(), theArgs.begin(), theArgs.end());
    std::vector<char *> aArgv;
    for (std::string &aString : aStrings)
      aArgv.push_back(&aString[0]);
    aArgv.push_back(nullptr);
    return theStep(static_cast<int>(aStrings.size()), aArgv.data());
  }

  // The code a step program raises with theArgs, its message into theMessage.
  static int32_t raised(int (*theStep)(int, char **), const std::vector<std::string> &theArgs,
                        std::string *theMessage = nullptr) {
    return tlrxRaisedCode([&] { run(theStep, theArgs); }, theMessage);
  }
};

// Compares a result with a reference: no-data positions exactly, values to a
// relative float tolerance.
inline void expectMatches(const std::vector<double> &theGot, const std::vector<double> &theWant, double theNull,
                          const std::string &theWhat) {
  ASSERT_EQ(theGot.size(), theWant.size()) << theWhat;
  for (size_t i = 0; i < theGot.size(); ++i) {
    if (theWant[i] == theNull)
      EXPECT_EQ(theGot[i], theNull) << theWhat << " pixel " << i;
    else
      EXPECT_NEAR(theGot[i], theWant[i], 2e-6 * std::max(1.0, std::fabs(theWant[i]))) << theWhat << " pixel " << i;
  }
}

// theRun under each of CTLRX_TEST_THREADS: the bytes of theFiles must be those
// of one thread. Returns them (one thread's), for checks of their values.
inline std::vector<std::string> expectSameBytesForThreads(const std::function<void()> &theRun,
                                                          const std::vector<std::string> &theFiles,
                                                          const std::string &theWhat) {
  std::vector<std::string> aOne;
  for (const int aThreads : CTLRX_TEST_THREADS) {
    const CTestThreads aSetting(aThreads);
    theRun();
    for (size_t i = 0; i < theFiles.size(); ++i) {
      const std::string aBytes = tlrxReadFile(theFiles[i]);
      if (aThreads == 1)
        aOne.push_back(aBytes);
      else
        EXPECT_TRUE(aBytes == aOne[i]) << theWhat << ": " << theFiles[i] << " with " << aThreads << " threads";
    }
  }
  return aOne;
}
