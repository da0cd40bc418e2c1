// tlrx_simulate: writes simulated SAR scenes with known truth (time series,
// correlated pairs, constant images) through the program's own raster file
// and header writer, for the tests, the demo and the benchmarks.
//
// The runtime runs in throw mode: a failure while writing becomes one clear
// message on standard error and exit status 1; a bad command line gives its
// message, the usage line and exit status 2. The runtime is started without
// its log and trace, so a run leaves nothing behind but the requested files.
#include "tlrx_envi_util.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"
#include "tlrx_platform.h"
#include "tlrx_sim_commands.h"
#include "tlrx_sim_options.h"

#include <cstdio>
#include <cstdlib>
#include <exception>
#include <string>
#include <vector>

namespace {

constexpr int CTLRX_SIM_EXIT_FAILURE = 1;
constexpr int CTLRX_SIM_EXIT_USAGE = 2;
constexpr const char *CTLRX_SIM_CONFIGURATION = "Tellurix_configuration.ini";

// The folder the runtime takes its configuration from, in its own order; the
// simulator only looks first so that a missing file gets a plain message.
std::string configurationDir() {
  for (const char *aVariable : {"TELLURIX_INIT_DIR", "windir"})
    if (const char *aValue = std::getenv(aVariable)) {
      const std::string aDir(aValue);
      return !aDir.empty() && aDir.back() == '/' ? aDir : aDir + "/";
    }
  return fdfExecutableDir() + "../etc/tellurix/";
}

// Error texts make the messages readable; without them the code still says it all.
void loadCatalogues() {
  std::string aDir;
  if (fdfGetEnvVar(aDir, "TELLURIX_CEOS_DES_FILES_DIR")) {
    fdfErrorCatalogue().load((aDir + "tlrx_errors_catalog.des").c_str());
    fdfWarningCatalogue().load((aDir + "tlrx_warnings_catalog.des").c_str());
  }
}

void printRuntimeError(const CErrorExceptionManager &theError) {
  std::string aTexts = theError.mPrimaryText;
  if (theError.mSecondaryText[0] != '\0')
    aTexts += std::string(" [") + theError.mSecondaryText + "]";
  std::fprintf(stderr, "tlrx_simulate: error %d (%s): %s\n", static_cast<int>(theError.mCode), aTexts.c_str(),
               theError.mMessage[0] != '\0' ? theError.mMessage : "no further detail");
}

} // namespace

int main(int argc, char **argv) {
  const std::vector<std::string> aArgs(argv + 1, argv + argc);
  if (fdfSimWantsHelp(aArgs)) {
    std::fputs(fdfSimHelpText().c_str(), stdout);
    return 0;
  }
  SSimOptions aOptions;
  try {
    aOptions = fdfSimParseOptions(aArgs);
  } catch (const CSimUsageError &aError) {
    std::fprintf(stderr, "tlrx_simulate: %s\n%s\n", aError.what(), fdfSimUsageLine());
    return CTLRX_SIM_EXIT_USAGE;
  }
  const std::string aConfiguration = configurationDir() + CTLRX_SIM_CONFIGURATION;
  if (!fdfExistFile(aConfiguration.c_str())) {
    std::fprintf(stderr,
                 "tlrx_simulate: no configuration: %s not found (set TELLURIX_INIT_DIR to the folder holding %s)\n",
                 aConfiguration.c_str(), CTLRX_SIM_CONFIGURATION);
    return CTLRX_SIM_EXIT_FAILURE;
  }
  try {
    fdfInitEnvironment(false, "tlrx_simulate (Tellurix scene simulator)");
    fdfInstallEnviHeaderWriter();
    fdfSetProcessName("tlrx_simulate");
    loadCatalogues();
    fdfSimRun(aOptions);
  } catch (const CErrorExceptionManager &aError) {
    printRuntimeError(aError);
    return CTLRX_SIM_EXIT_FAILURE;
  } catch (const std::exception &aError) {
    std::fprintf(stderr, "tlrx_simulate: error: %s\n", aError.what());
    return CTLRX_SIM_EXIT_FAILURE;
  }
  return 0;
}
