// The files of a run that must not outlive its failure: removed when a
// raised error unwinds past their guard, kept once forgotten or when the run
// ends well; a result's own guard hands its files to the run's.
#include "tlrx_errors.h"
#include "tlrx_pending_files.h"
#include "tlrx_platform.h"
#include "tlrx_test_support.h"

#include <gtest/gtest.h>

TEST(PendingFiles, FailuresRemoveRegisteredFilesAndCompletedOnesStay) {
  CTempDir aDir;
  tlrxStartLibraryEnvironment(aDir.path());
  // The error reports go to a working file that exists: no retry pauses.
  tlrxWriteFile(aDir.file("Process.working"), "0\nhost\n");
  const TLRXSleepFunction aOldSleep = fdfSetSleepFunction([](double) {});
  const std::string aRaster = aDir.file("r"), aOther = aDir.file("x.txt");
  auto aWrite = [&] {
    for (const std::string &aName : {aRaster, aRaster + ".sml", aRaster + ".hdr", aOther})
      tlrxWriteFile(aName, "x");
  };
  // An error leaving the guard's scope removes them.
  aWrite();
  try {
    CPendingFiles aGuard;
    aGuard.addRaster(aRaster);
    aGuard.addFile(aOther);
    TLRX_RAISE(261124, "test");
  } catch (const CErrorExceptionManager &) {
  }
  for (const std::string &aName : {aRaster, aRaster + ".sml", aRaster + ".hdr", aOther})
    EXPECT_FALSE(tlrxFileExists(aName)) << aName;
  // Normal end and forgotten files: kept.
  aWrite();
  {
    CPendingFiles aGuard;
    aGuard.addRaster(aRaster);
    aGuard.forgetRaster(aRaster);
  }
  EXPECT_TRUE(tlrxFileExists(aRaster));
  fdfSetSleepFunction(aOldSleep);
}

TEST(PendingFiles, ResultsHandedToTheRunGoWhenTheRunFailsLater) {
  CTempDir aDir;
  tlrxStartLibraryEnvironment(aDir.path());
  tlrxWriteFile(aDir.file("Process.working"), "0\nhost\n");
  const TLRXSleepFunction aOldSleep = fdfSetSleepFunction([](double) {});
  const std::string aFirst = aDir.file("first"), aSecond = aDir.file("second"), aTiff = aDir.file("first.tif");
  for (const std::string &aName : {aFirst, aSecond, aTiff})
    tlrxWriteFile(aName, "x");
  try {
    CPendingFiles aRun;
    {
      // Two results in progress at once, completed in the order they began;
      // the second's guard is nested in the first's, yet both reach the run.
      CPendingFiles aFirstResult;
      CPendingFiles aSecondResult;
      aFirstResult.addFile(aFirst);
      aSecondResult.addFile(aSecond);
      aFirstResult.handOver();
      aSecondResult.handOver();
    }
    fdfAddPendingFile(aTiff); // registered from below, e.g. by the GeoTIFF writer
    TLRX_RAISE(130564, "test");
  } catch (const CErrorExceptionManager &) {
  }
  for (const std::string &aName : {aFirst, aSecond, aTiff})
    EXPECT_FALSE(tlrxFileExists(aName)) << aName;
  // Without a guard nothing is registered, so nothing is removed later.
  tlrxWriteFile(aTiff, "x");
  fdfAddPendingFile(aTiff);
  try {
    CPendingFiles aRun;
    TLRX_RAISE(130564, "test");
  } catch (const CErrorExceptionManager &) {
  }
  EXPECT_TRUE(tlrxFileExists(aTiff));
  fdfSetSleepFunction(aOldSleep);
}
