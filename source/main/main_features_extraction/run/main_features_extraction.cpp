// Program entry: start-up, command dispatch and the closing of the run.
#include "main_features_extraction.h"

#include "main_coherence.h"
#include "main_correlation.h"
#include "main_mean_std_range.h"
#include "main_ratio.h"
#include "main_search_min_max_value.h"
#include "main_texture.h"
#include "tlrx_envi_util.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_platform.h"
#include "tlrx_threads.h"

#include <cstring>
#include <exception>
#include <string>

namespace {

// Drivers not built yet stand as nullptr and answer like an unknown command.
const STLRXCommand sCommands[CTLRX_COMMAND_COUNT] = {
    {"main_texture#", main_texture},
    {"main_ratio#", main_ratio},
    {"main_correlation#", main_correlation},
    {"main_coherence#", main_coherence},
    {"main_temporal_feature_extraction#", main_mean_std_range},
    {"main_principal_component_analysis#", nullptr},
    {"main_min_and_max#", main_search_min_max_value},
};

const char *const sTrailerMarker = "###Tellurix###";

// The command line as the host gave it, kept for the whole run.
std::string sCommandLine;

// Anything else escaping a command, reported as 913920 with the process
// that was running.
CErrorExceptionManager fdfUnexpected(int theLine) {
  return CErrorExceptionManager(CTLRX_ERR_UNEXPECTED, theLine, __FILE__, fdfGetProcessName(), fdfGetProcessName());
}

} // namespace

const STLRXCommand *fdfCommandTable() { return sCommands; }

const char *fdfProductBanner() {
  static const std::string aBanner =
      std::string("Tellurix Feature Extraction - SAR Edition for Tellurix Workbench  4.3.000") + __DATE__;
  return aBanner.c_str();
}

int fdfMatchCommand(const char *theCommandLine, const char **theArguments) {
  for (int i = 0; i < CTLRX_COMMAND_COUNT; ++i) {
    const size_t aLen = std::strlen(sCommands[i].mPrefix);
    if (std::strncmp(theCommandLine, sCommands[i].mPrefix, aLen) == 0) {
      *theArguments = theCommandLine + aLen;
      return i;
    }
  }
  return -1;
}

int main_features_extraction(const char *theLine) {
  sCommandLine = theLine != nullptr ? theLine : "";
  try {
    fdfInitEnvironment(true, fdfProductBanner());
    // Every header written from now on gets its ENVI header beside it.
    fdfInstallEnviHeaderWriter();
    const size_t aTrailer = sCommandLine.find(sTrailerMarker);
    if (aTrailer != std::string::npos)
      sCommandLine.erase(aTrailer);
    fdfTraceMessage("\nlpCmdLine =%s\n", sCommandLine.c_str());
    // A bad thread count is refused here, before any command opens a file.
    fdfTraceMessage("threads = %d\n", fdfThreadCount());
    const char *aArguments = nullptr;
    const int aCommand = fdfMatchCommand(sCommandLine.c_str(), &aArguments);
    fdfTraceMessage("aCommand =%d\n", aCommand);
    int32_t aStatus = CTLRX_ERR_UNKNOWN_COMMAND;
    if (aCommand >= 0 && sCommands[aCommand].mDriver != nullptr)
      aStatus = sCommands[aCommand].mDriver(aArguments);
    // A driver's failing status is reported like any raised error.
    if (aStatus != 0)
      fdfRaiseError(aStatus, nullptr, __FILE__, 100);
    return fdfExitStatus(fdfEndProcess(0, true, true));
  } catch (const CErrorExceptionManager &aError) {
    return fdfReportError(aError);
  } catch (const std::exception &aError) {
    fdfTraceMessage("Exception raised: %s\n", aError.what());
    return fdfReportError(fdfUnexpected(__LINE__));
  } catch (...) {
    return fdfReportError(fdfUnexpected(__LINE__));
  }
}
