// The files of a run that must not outlive its failure: removed when a
// raised error unwinds past their guard, kept once forgotten or when the run
// ends well; a result's own guard hands its files to the run's.
#include "tlrx_errors.h"
#include "tlrx_pending_files.h"
#include "tlrx_platform.h"
#include "tlrx_test_support.h"
#include <gtest/gtest.h>

namespace {

void write(const std::vector<std::string> &theNames) {
  for (const std::string &aName : theNames)
    tlrxWriteFile(aName, "x");
}

} // namespace

TEST(PendingFiles, FailuresRemoveRegisteredFilesAndCompletedOnesStay) {
  CTempDir aDir;
  tlrxStartLibraryEnvironment(aDir.path());
  // The error reports go to a working file that exists: no retry pauses.
  tlrxWriteFile(aDir.file("Process.working"), "0\nhost\n");
  const TLRXSleepFunction aOldSleep = fdfSetSleepFunction([](double) {});
  const std::string aRaster = aDir.file("r"), aOther = aDir.file("x.txt");
  const std::string aFirst = aDir.file("first"), aSecond = aDir.file("second"), aTiff = aDir.file("first.tif");
  const std::vector<std::string> aAll = {aRaster, aRaster + ".sml", aRaster + ".hdr", aOther, aFirst, aSecond, aTiff};
  write(aAll);
  try {
    CPendingFiles aGuard;
    aGuard.addRaster(aRaster);
    aGuard.addFile(aOther);
    {
      // Two results in progress at once, completed in the order they began;
      // the second's guard is nested in the first's, yet both reach the run.
      CPendingFiles aFirstResult, aSecondResult;
      aFirstResult.addFile(aFirst);
      aSecondResult.addFile(aSecond);
      aFirstResult.handOver();
      aSecondResult.handOver();
    }
    fdfAddPendingFile(aTiff); // registered from below, e.g. by the GeoTIFF writer
    TLRX_RAISE(261124, "test");
  } catch (const CErrorExceptionManager &) {
  }
  for (const std::string &aName : aAll)
    EXPECT_FALSE(tlrxFileExists(aName)) << aName;
  // Normal end and forgotten files: kept; without a guard nothing is
  // registered, so nothing is removed later.
  write({aRaster, aTiff});
  {
    CPendingFiles aGuard;
    aGuard.addRaster(aRaster);
    aGuard.forgetRaster(aRaster);
  }
  fdfAddPendingFile(aTiff);
  try {
    CPendingFiles aRun;
    TLRX_RAISE(130564, "test");
  } catch (const CErrorExceptionManager &) {
  }
  EXPECT_TRUE(tlrxFileExists(aRaster));
  EXPECT_TRUE(tlrxFileExists(aTiff));
  fdfSetSleepFunction(aOldSleep);
}
