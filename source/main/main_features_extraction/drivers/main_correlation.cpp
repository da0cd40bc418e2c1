// Correlation driver: reads its tokens, plans normalisation, correlation (and
// GeoTIFF) steps and runs them through the step runner. The closing switch
// decides whether the correlation step's closing operation removes the
// normalisation image once the coherence image is written.
#include "main_correlation.h"

#include "normalize_images.h"
#include "quick_and_dirty.h"
#include "tlrx_driver_guard.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_step_common.h"
#include "tlrx_generic_utility.h"
#include "tlrx_raster_to_geotiff.h"
#include "tlrx_result_files.h"
#include "tlrx_step_runner.h"

#include <string>
#include <vector>

namespace {

enum ECorrelationToken { CTLRX_CORR_INPUT1, CTLRX_CORR_INPUT2, CTLRX_CORR_ROOT, CTLRX_CORR_DUMMY,
                         CTLRX_CORR_NORM_ROWS, CTLRX_CORR_NORM_COLS, CTLRX_CORR_ROWS, CTLRX_CORR_COLS,
                         CTLRX_CORR_CLOSE, CTLRX_CORR_TIFF, CTLRX_CORR_SATURATION, CTLRX_CORR_TOKENS };

enum ECorrelationStep { CTLRX_CORR_NORMALIZE_STEP, CTLRX_CORR_CORRELATION_STEP, CTLRX_CORR_TIFF_STEP };

const char *const sNormSuffix = "_norm";

// The step table; without the closing switch no step closes anything.
std::vector<STLRXStep> fdfCorrelationSteps(bool theClose) {
  return {
      {"normalize_images", normalize_images, fdfStepNothingToClose},
      {"quick_and_dirty", quick_and_dirty, theClose ? quick_and_dirty_close : fdfStepNothingToClose},
      {"Out File to tiff conversion", make_tiff, fdfStepNothingToClose},
  };
}

std::vector<std::string> fdfCorrelationArguments(const std::vector<std::string> &theTokens, int theStep) {
  const std::string &aRoot = theTokens[CTLRX_CORR_ROOT];
  switch (theStep) {
  case CTLRX_CORR_NORMALIZE_STEP:
    return {theTokens[CTLRX_CORR_INPUT1], theTokens[CTLRX_CORR_INPUT2], aRoot + sNormSuffix,
            theTokens[CTLRX_CORR_DUMMY],  theTokens[CTLRX_CORR_NORM_ROWS], theTokens[CTLRX_CORR_NORM_COLS]};
  case CTLRX_CORR_CORRELATION_STEP:
    return {theTokens[CTLRX_CORR_INPUT1], theTokens[CTLRX_CORR_INPUT2], aRoot + sNormSuffix, aRoot,
            theTokens[CTLRX_CORR_DUMMY],  theTokens[CTLRX_CORR_ROWS],   theTokens[CTLRX_CORR_COLS]};
  default:
    return {aRoot, aRoot + ".tif", theTokens[CTLRX_CORR_SATURATION], "1", "1"};
  }
}

int32_t fdfRunCorrelation(const char *theArguments) {
  const std::vector<std::string> aTokens = fdfStartArgumentCommand(theArguments, "Correlation");
  if (aTokens.size() < CTLRX_CORR_TOKENS)
    return CTLRX_ERR_ARGUMENTS;
  fdfTraceTokens(aTokens, CTLRX_CORR_TOKENS);
  const bool aTiff = fdfIsSwitchOn(aTokens[CTLRX_CORR_TIFF]);
  if (aTiff) // a bad saturation stops the run before anything is computed
    fdfRealToken(aTokens[CTLRX_CORR_SATURATION].c_str(), "saturation", CTLRX_ERR_PARAMETER_FILE);
  CRunFiles aFiles;
  aFiles.addRead(theArguments);
  aFiles.addInput(aTokens[CTLRX_CORR_INPUT1]);
  aFiles.addInput(aTokens[CTLRX_CORR_INPUT2]);
  aFiles.addResult(aTokens[CTLRX_CORR_ROOT] + sNormSuffix, false);
  aFiles.addResult(aTokens[CTLRX_CORR_ROOT], aTiff);
  aFiles.refuseClashes(CTLRX_ERR_ARGUMENTS);
  CStepRunner aRunner(fdfCorrelationSteps(fdfIsSwitchOn(aTokens[CTLRX_CORR_CLOSE])), "INT");
  std::vector<int> aPlan = {CTLRX_CORR_NORMALIZE_STEP, CTLRX_CORR_CORRELATION_STEP};
  if (aTiff)
    aPlan.push_back(CTLRX_CORR_TIFF_STEP);
  return aRunner.run(aPlan, [&](int, int theStep) { return fdfCorrelationArguments(aTokens, theStep); });
}

} // namespace

int32_t main_correlation(const char *theArguments) {
  return fdfRunGuardedDriver(fdfRunCorrelation, theArguments);
}
