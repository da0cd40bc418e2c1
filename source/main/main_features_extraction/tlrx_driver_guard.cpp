#include "tlrx_driver_guard.h"

#include "tlrx_enviroment.h"
#include "tlrx_errors.h"

#include <exception>

int32_t fdfRunGuardedDriver(TLRXDriverBody theBody, const char *theArguments) {
  try {
    return theBody(theArguments);
  } catch (const CErrorExceptionManager &) {
    throw;
  } catch (const std::exception &aError) {
    fdfTraceMessage("Exception raised: %s\n", aError.what());
    TLRX_RAISE(CTLRX_ERR_UNEXPECTED, fdfGetProcessName());
  } catch (...) {
    TLRX_RAISE(CTLRX_ERR_UNEXPECTED, fdfGetProcessName());
  }
}
