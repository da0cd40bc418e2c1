// Ratio driver: reads its tokens and file list, plans ratio (and GeoTIFF)
// steps for consecutive pairs and runs them through the step runner.
#include "main_ratio.h"

#include "ratio_images.h"
#include "tlrx_driver_guard.h"
#include "tlrx_enviroment.h"
#include "tlrx_step_common.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"
#include "tlrx_raster_to_geotiff.h"
#include "tlrx_result_files.h"
#include "tlrx_step_runner.h"


namespace {

enum ERatioToken { CTLRX_RATIO_LIST, CTLRX_RATIO_ROOT, CTLRX_RATIO_DB, CTLRX_RATIO_UNUSED, CTLRX_RATIO_TIFF,
                   CTLRX_RATIO_SATURATION, CTLRX_RATIO_TOKENS };

const std::vector<STLRXStep> sRatioSteps = {
    {"Ratio", ratio_images, fdfStepNothingToClose},
    {"ratio to tiff conversion", make_tiff, fdfStepNothingToClose},
};

int32_t fdfRunRatio(const char *theArguments) {
  const std::vector<std::string> aTokens = fdfStartArgumentCommand(theArguments, "Ratio");
  CStepRunner aRunner(sRatioSteps, "RATIO");
  if (aTokens.size() < CTLRX_RATIO_TOKENS)
    return CTLRX_ERR_ARGUMENTS;
  fdfTraceTokens(aTokens, CTLRX_RATIO_TOKENS);
  const bool aTiff = fdfIsSwitchOn(aTokens[CTLRX_RATIO_TIFF]);
  // Bad numbers stop the run before any result is written.
  fdfIntegerToken(aTokens[CTLRX_RATIO_DB].c_str(), "decibel switch", CTLRX_ERR_PARAMETER_FILE);
  if (aTiff)
    fdfRealToken(aTokens[CTLRX_RATIO_SATURATION].c_str(), "saturation", CTLRX_ERR_PARAMETER_FILE);
  const std::vector<std::string> aFiles = fdfReadNameList(aTokens[CTLRX_RATIO_LIST].c_str());
  fdfTraceMessage("Number of FILES = %d\n", static_cast<int>(aFiles.size()));
  // Nothing to compute is not a success the host could mistake for results.
  if (aFiles.size() < 2) {
    fdfTraceMessage("aNumberOfFiles = %d\n", static_cast<int>(aFiles.size()));
    TLRX_RAISE(CTLRX_ERR_ARGUMENTS, aTokens[CTLRX_RATIO_LIST].c_str());
  }
  CRunFiles aRunFiles;
  aRunFiles.addRead(theArguments);
  aRunFiles.addRead(aTokens[CTLRX_RATIO_LIST]);
  for (size_t k = 0; k < aFiles.size(); ++k) {
    aRunFiles.addInput(aFiles[k]);
    if (k + 1 < aFiles.size())
      aRunFiles.addResult(fdfRatioPairName(aTokens[CTLRX_RATIO_ROOT], static_cast<int>(k), aFiles.size()), aTiff);
  }
  aRunFiles.refuseClashes(CTLRX_ERR_ARGUMENTS);
  int aPair = -1;
  return aRunner.run(fdfRatioPlan(aFiles.size(), aTiff), [&](int, int theStep) -> std::vector<std::string> {
    if (theStep == 0) {
      ++aPair;
      return {aFiles[aPair], aFiles[aPair + 1], fdfRatioPairName(aTokens[CTLRX_RATIO_ROOT], aPair, aFiles.size()),
              aTokens[CTLRX_RATIO_DB]};
    }
    const std::string aName = fdfRatioPairName(aTokens[CTLRX_RATIO_ROOT], aPair, aFiles.size());
    return {aName, aName + ".tif", aTokens[CTLRX_RATIO_SATURATION]};
  });
}

} // namespace

std::string fdfRatioPairName(const std::string &theRoot, int thePair, size_t theFiles) {
  std::string aRoot = theRoot;
  if (aRoot.size() >= 4 && aRoot.compare(aRoot.size() - 4, 4, "_rto") == 0)
    aRoot.erase(aRoot.rfind('_'));
  if (theFiles > 2)
    return aRoot + "_" + std::to_string(thePair) + "_rto";
  return aRoot + "_rto";
}

std::vector<int> fdfRatioPlan(size_t theFiles, bool theTiff) {
  std::vector<int> aPlan;
  for (size_t k = 0; k + 1 < theFiles; ++k) {
    aPlan.push_back(0);
    if (theTiff)
      aPlan.push_back(1);
  }
  return aPlan;
}

int32_t main_ratio(const char *theArguments) { return fdfRunGuardedDriver(fdfRunRatio, theArguments); }
