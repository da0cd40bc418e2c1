// Trace capture of the tests: start the process trace, stop it and read it.
#pragma once

#include "tlrx_enviroment.h"
#include "tlrx_test_support.h"

#include <string>

// Starts the trace (the runtime must be started); false when it did not open.
inline bool tlrxStartTrace() {
  fdfSetEnvVar("ACTIVE", "TELLURIX_TRACING");
  return fdfOpenTrace(false);
}

// Stops the trace and returns what the trace file of theDir (the working
// folder, with its trailing "/") holds.
inline std::string tlrxStopTrace(const std::string &theDir) {
  fdfCloseTrace();
  fdfSetEnvVar("NOT_ACTIVE", "TELLURIX_TRACING");
  return tlrxReadFile(theDir + "Process.trace");
}
