// Texture: out = sqrt(q - m^2) / m over the window of each pixel, from the
// amplitudes of the input (an intensity input is taken to amplitude first).
// Formula, window, edges and no-data rules: tlrx_window_measures.h and
// tlrx_window_sums.h. The input streams through a ring of R line slots.
#include "texture.h"

#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_features_common.h"
#include "tlrx_raster_file.h"
#include "tlrx_result_files.h"
#include "tlrx_window_measures.h"
#include "tlrx_window_step.h"
#include "tlrx_window_sums.h"

#include <cstdlib>
#include <vector>

namespace {

void fdfTraceTextureUsage(const char *theProgram) {
  fdfTraceMessage("Usage: %s <input> <output> <int_par> [ref_image]\n"
                  "  input\t\t\t  input image file name, short int/ or float\n"
                  "  output  \t\t  output image file name, float\n"
                  "  dummy           dummy value \n"
                  "  row             rows number in texture window \n"
                  "  col             cols number in texture window \n",
                  theProgram);
}

} // namespace

int texture(int argc, char **argv) {
  fdfTraceMessage("Texture Derodi program version 1.0 05-gen-2000\n");
  if (argc < 6) {
    fdfTraceTextureUsage(argc > 0 ? argv[0] : "texture");
    TLRX_RAISE(CTLRX_ERR_SETTING_MISSING, nullptr);
  }
  const int32_t aRows = fdfIntegerToken(argv[4], "window rows", CTLRX_ERR_WINDOW_SIZE);
  const int32_t aCols = fdfIntegerToken(argv[5], "window columns", CTLRX_ERR_WINDOW_SIZE);
  fdfTraceMessage("  input image file name   : %s\n  output image file name  : %s\n"
                  "  rows number in texture window : %d\n  cols number in texture window : %d\n",
                  argv[1], argv[2], aRows, aCols);
  fdfCheckWindowSize(aRows, aCols);

  CWindowInput aInput(argv[1]);
  fdfTraceMessage(aInput.deliversIntensity() ? "Intensity (Power)input image\n" : "Amplitude input image\n");
  aInput.open();
  const float aNull = fdfGetDummyValue();
  CDescription aHeader;
  fdfMakeWindowResultHeader(aHeader, aInput.header(), fdfGetDummyValueDouble(), "NUMBER");
  CResultRaster aOutput(argv[2], aHeader);

  const int32_t aPixels = aInput.pixels();
  CWindowRing aRing(aRows, aCols, aPixels, CTLRX_TEXTURE_CHANNELS);
  double *const aTerms[CTLRX_TEXTURE_CHANNELS] = {aRing.terms(0), aRing.terms(1), aRing.terms(2)};
  const double *const aSums[CTLRX_TEXTURE_CHANNELS] = {aRing.column(0), aRing.column(1), aRing.column(2)};
  std::vector<float> aLine(static_cast<size_t>(aPixels));
  CLineProgress aProgress(97.0, 2);
  fdfRunWindowSchedule(
      aRing, aInput.lines(),
      [&](int32_t theLine) {
        aInput.readLine(theLine);
        fdfTextureTerms(aInput.values(), aInput.mask(), aPixels, aInput.deliversIntensity(), aTerms,
                        aRing.centre(theLine));
      },
      [&](int32_t theLine) {
        fdfTextureLine(aSums, aRing.centre(theLine), aPixels, aNull, aLine.data());
        aOutput.file().putLine(theLine, aLine.data());
      },
      [&](int32_t theLine, int32_t theLines) { aProgress.update(theLine, theLines); });
  aInput.close();
  fdfTraceMessage("writing the output parameter file %s\n", argv[2]);
  aOutput.commit(aHeader, CTLRX_ERR_FILE_COPY);
  return 0;
}
