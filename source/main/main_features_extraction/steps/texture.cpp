// Texture: out = sqrt(q - m^2) / m over the window of each pixel, from the
// amplitudes of the input (an intensity input is taken to amplitude first).
// Formula, window, edges and no-data rules: tlrx_window_measures.h and
// tlrx_window_sums.h. The input streams through the window step runner.
#include "texture.h"

#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_step_common.h"
#include "tlrx_result_files.h"
#include "tlrx_window_measures.h"
#include "tlrx_window_step.h"

namespace {

void fdfTraceTextureUsage(int theArgc, char **theArgv) {
  fdfTraceMessage("Usage: %s <input> <output> <int_par> [ref_image]\n"
                  "  input\t\t\t  input image file name, short int/ or float\n"
                  "  output  \t\t  output image file name, float\n"
                  "  dummy           dummy value \n"
                  "  row             rows number in texture window \n"
                  "  col             cols number in texture window \n",
                  theArgc > 0 ? theArgv[0] : "texture");
}

const SWindowStepSyntax CTLRX_TEXTURE_SYNTAX{"Texture Derodi program version 1.0 05-gen-2000\n", 5,
                                             fdfTraceTextureUsage, CTLRX_ERR_SETTING_MISSING,
                                             CTLRX_CLIPPED_WINDOW_RULE};

} // namespace

int texture(int argc, char **argv) {
  CWindowStep aStep(argc, argv, CTLRX_TEXTURE_SYNTAX);
  const int32_t aRows = aStep.windowArgument(4, "window rows");
  const int32_t aCols = aStep.windowArgument(5, "window columns");
  fdfTraceMessage("  input image file name   : %s\n  output image file name  : %s\n"
                  "  rows number in texture window : %d\n  cols number in texture window : %d\n",
                  argv[1], argv[2], aRows, aCols);
  aStep.setWindow(aRows, aCols);

  aStep.addInputs({1});
  CWindowInput &aInput = aStep.input(0);
  fdfTraceMessage(aInput.deliversIntensity() ? "Intensity (Power)input image\n" : "Amplitude input image\n");
  aStep.openInputs();
  CDescription aHeader;
  fdfMakeWindowResultHeader(aHeader, aInput.header(), fdfGetDummyValueDouble(), "NUMBER");
  CResultRaster aOutput(argv[2], aHeader);

  const float aNull = fdfGetDummyValue();
  aStep.runLines(
      aOutput, CTLRX_TEXTURE_CHANNELS,
      [&](int32_t theLine, double *const *theTerms, uint8_t *theCentre) {
        fdfTextureTerms(aInput.values(theLine), aInput.mask(theLine), aInput.pixels(), aInput.deliversIntensity(),
                        theTerms, theCentre);
      },
      [&](int, const double *const *theSums, const uint8_t *theCentre, float *theOut) {
        fdfTextureLine(theSums, theCentre, aInput.pixels(), aNull, theOut);
      });
  aStep.commit(aOutput, aHeader);
  return 0;
}
