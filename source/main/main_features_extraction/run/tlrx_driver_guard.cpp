#include "tlrx_driver_guard.h"

#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_pending_files.h"

#include <exception>

int32_t fdfRunGuardedDriver(TLRXDriverBody theBody, const char *theArguments, bool theExceptionText) {
  // The results of the run are removed should it fail, down to the last
  // GeoTIFF copy: a failed run leaves nothing that looks like its result.
  CPendingFiles aRun;
  try {
    const int32_t aStatus = theBody(theArguments);
    if (aStatus == 0)
      aRun.forgetAll();
    else
      aRun.removeAll();
    return aStatus;
  } catch (const CErrorExceptionManager &) {
    throw;
  } catch (const std::exception &aError) {
    fdfTraceMessage("Exception raised: %s\n", aError.what());
    TLRX_RAISE(CTLRX_ERR_UNEXPECTED, theExceptionText ? aError.what() : fdfGetProcessName());
  } catch (...) {
    TLRX_RAISE(CTLRX_ERR_UNEXPECTED, fdfGetProcessName());
  }
}
