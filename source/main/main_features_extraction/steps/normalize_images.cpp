// Normalisation of an intensity pair: out = (S1 / n1 + S2 / n2) / 2 over the
// window of each pixel, the intensities being the squares of amplitude inputs
// or the values of "POWER" inputs. Formula, window, edges and no-data rules:
// tlrx_window_measures.h and tlrx_window_sums.h.
#include "normalize_images.h"

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

int normalize_images(int argc, char **argv) {
  fdfTraceMessage("Texture Derodi program version 1.0 05-gen-2000\n");
  if (argc < 7) {
    fdfTracePairStepUsage(argc, argv, false);
    TLRX_RAISE(CTLRX_ERR_SETTING_MISSING, nullptr);
  }
  const double aDummy = fdfRealToken(argv[4], "dummy value", CTLRX_ERR_PARAMETER_FILE);
  const int32_t aRows = fdfIntegerToken(argv[5], "window rows", CTLRX_ERR_WINDOW_SIZE);
  const int32_t aCols = fdfIntegerToken(argv[6], "window columns", CTLRX_ERR_WINDOW_SIZE);
  fdfTraceMessage("  input file 1 name   : %s\n  input file 2 name   : %s\n  output image file name  : %s\n"
                  "  dummy value             :%g\n  rows number in texture window : %d\n"
                  "  cols number in texture window : %d\n",
                  argv[1], argv[2], argv[3], aDummy, aRows, aCols);
  fdfCheckWindowSize(aRows, aCols);

  CWindowInput aFirst(argv[1]);
  CWindowInput aSecond(argv[2]);
  fdfCheckSameSize(aFirst, aSecond);
  for (const CWindowInput *aInput : {&aFirst, &aSecond})
    if (aInput->deliversIntensity())
      fdfTraceMessage(" Intensity\n");
  aFirst.open();
  aSecond.open();
  CDescription aHeader;
  fdfMakeWindowResultHeader(aHeader, aFirst.header(), aDummy, nullptr);
  CResultRaster aOutput(argv[3], aHeader);

  const int32_t aPixels = aFirst.pixels();
  CWindowRing aRing(aRows, aCols, aPixels, CTLRX_NORMALIZE_CHANNELS);
  double *const aTerms[CTLRX_NORMALIZE_CHANNELS] = {aRing.terms(0), aRing.terms(1), aRing.terms(2), aRing.terms(3)};
  const double *const aSums[CTLRX_NORMALIZE_CHANNELS] = {aRing.column(0), aRing.column(1), aRing.column(2),
                                                          aRing.column(3)};
  std::vector<float> aLine(static_cast<size_t>(aPixels));
  const float aNull = static_cast<float>(aDummy);
  int64_t aComputed = 0;
  CLineProgress aProgress(97.0, 2);
  fdfRunWindowSchedule(
      aRing, aFirst.lines(),
      [&](int32_t theLine) {
        aFirst.readLine(theLine);
        aSecond.readLine(theLine);
        fdfNormalizeTerms(aFirst.values(), aFirst.mask(), aFirst.deliversIntensity(), aSecond.values(),
                          aSecond.mask(), aSecond.deliversIntensity(), aPixels, aTerms, aRing.centre(theLine));
      },
      [&](int32_t theLine) {
        aComputed += fdfNormalizeLine(aSums, aRing.centre(theLine), aPixels, aNull, aLine.data());
        aOutput.file().putLine(theLine, aLine.data());
      },
      [&](int32_t theLine, int32_t theLines) { aProgress.update(theLine, theLines); });
  aFirst.close();
  aSecond.close();
  fdfTraceSignificantCount(aDummy, aComputed);
  fdfTraceMessage("writing the output parameter file %s\n", argv[3]);
  aOutput.commit(aHeader, CTLRX_ERR_FILE_COPY);
  return 0;
}
