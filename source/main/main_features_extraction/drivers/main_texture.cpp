// Texture driver: reads its tokens, plans the texture step (and the GeoTIFF
// step) and runs them through the step runner.
#include "main_texture.h"

#include "texture.h"
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

enum ETextureToken { CTLRX_TEXTURE_INPUT, CTLRX_TEXTURE_OUTPUT, CTLRX_TEXTURE_DUMMY, CTLRX_TEXTURE_ROWS,
                     CTLRX_TEXTURE_COLS, CTLRX_TEXTURE_UNUSED, CTLRX_TEXTURE_TIFF, CTLRX_TEXTURE_SATURATION,
                     CTLRX_TEXTURE_TOKENS };

enum ETextureStep { CTLRX_TEXTURE_STEP, CTLRX_TEXTURE_TIFF_STEP };

const std::vector<STLRXStep> sTextureSteps = {
    {"texture", texture, fdfStepNothingToClose},
    {"texture to tiff conversion", make_tiff, fdfStepNothingToClose},
};

int32_t fdfRunTexture(const char *theArguments) {
  const std::vector<std::string> aTokens = fdfStartArgumentCommand(theArguments, "Texture");
  CStepRunner aRunner(sTextureSteps, "TEXTURE");
  if (aTokens.size() < CTLRX_TEXTURE_TOKENS)
    return CTLRX_ERR_ARGUMENTS;
  fdfTraceTokens(aTokens, CTLRX_TEXTURE_TOKENS);
  const bool aTiff = fdfIsSwitchOn(aTokens[CTLRX_TEXTURE_TIFF]);
  if (aTiff) // a bad saturation stops the run before the texture is computed
    fdfRealToken(aTokens[CTLRX_TEXTURE_SATURATION].c_str(), "saturation", CTLRX_ERR_PARAMETER_FILE);
  CRunFiles aFiles;
  aFiles.addRead(theArguments);
  aFiles.addInput(aTokens[CTLRX_TEXTURE_INPUT]);
  aFiles.addResult(aTokens[CTLRX_TEXTURE_OUTPUT], aTiff);
  aFiles.refuseClashes(CTLRX_ERR_ARGUMENTS);
  std::vector<int> aPlan = {CTLRX_TEXTURE_STEP};
  if (aTiff)
    aPlan.push_back(CTLRX_TEXTURE_TIFF_STEP);
  return aRunner.run(aPlan, [&](int, int theStep) -> std::vector<std::string> {
    const std::string &aOutput = aTokens[CTLRX_TEXTURE_OUTPUT];
    if (theStep == CTLRX_TEXTURE_STEP)
      return {aTokens[CTLRX_TEXTURE_INPUT], aOutput, aTokens[CTLRX_TEXTURE_DUMMY], aTokens[CTLRX_TEXTURE_ROWS],
              aTokens[CTLRX_TEXTURE_COLS]};
    return {aOutput, aOutput + ".tif", aTokens[CTLRX_TEXTURE_SATURATION], "1", "1"};
  });
}

} // namespace

int32_t main_texture(const char *theArguments) { return fdfRunGuardedDriver(fdfRunTexture, theArguments); }
