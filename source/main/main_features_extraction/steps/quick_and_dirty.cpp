// Intensity coherence: x = I / n with n the normalisation image,
// r = X / sqrt(A B) over the window (X, A, B: sums of x1 x2, x1^2, x2^2),
// g = sqrt(2 r - 1) for r > 0.5, else 0. Formula, its bias, window, edges and
// no-data rules: tlrx_window_measures.h/.cpp and tlrx_window_sums.h.
#include "quick_and_dirty.h"

#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_features_common.h"
#include "tlrx_generic_utility.h"
#include "tlrx_raster_file.h"
#include "tlrx_result_files.h"
#include "tlrx_window_measures.h"
#include "tlrx_window_step.h"
#include "tlrx_window_sums.h"

#include <cstdlib>
#include <vector>

namespace {

void fdfTraceCorrelationStats(const SCorrelationStats &theStats) {
  fdfTraceMessage("Number  =%lld\nNumber of  >0.8 =%lld\nNumber of  >0.7 =%lld\nNumber of  >0.5 =%lld\n"
                  "Number of  >0 =%lld\n",
                  static_cast<long long>(theStats.mComputed), static_cast<long long>(theStats.mAbove08),
                  static_cast<long long>(theStats.mAbove07), static_cast<long long>(theStats.mAbove05),
                  static_cast<long long>(theStats.mAbove0));
}

} // namespace

int quick_and_dirty(int argc, char **argv) {
  fdfTraceMessage("Texture Derodi program version 1.0 05-gen-2000\n");
  if (argc < 8) {
    fdfTracePairStepUsage(argc, argv, true);
    TLRX_RAISE(CTLRX_ERR_SETTING_MISSING, nullptr);
  }
  const int32_t aRows = fdfIntegerToken(argv[6], "window rows", CTLRX_ERR_WINDOW_SIZE);
  const int32_t aCols = fdfIntegerToken(argv[7], "window columns", CTLRX_ERR_WINDOW_SIZE);
  fdfTraceMessage("  input file 1 name   : %s\n  input file 2 name   : %s\n  Norm image file name  : %s\n"
                  "  output image file name  : %s\n  rows number in texture window : %d\n"
                  "  cols number in texture window : %d\n",
                  argv[1], argv[2], argv[3], argv[4], aRows, aCols);
  fdfCheckWindowSize(aRows, aCols);

  CWindowInput aFirst(argv[1]);
  CWindowInput aSecond(argv[2]);
  CWindowInput aNorm(argv[3]);
  fdfCheckSameSize(aFirst, aSecond);
  fdfCheckSameSize(aFirst, aNorm);
  for (const CWindowInput *aInput : {&aFirst, &aSecond})
    if (aInput->deliversIntensity())
      fdfTraceMessage(" Intensity\n");
  aFirst.open();
  aSecond.open();
  aNorm.open();
  const float aNull = fdfGetDummyValue();
  CDescription aHeader;
  fdfMakeWindowResultHeader(aHeader, aFirst.header(), fdfGetDummyValueDouble(), "COHERENCE");
  fdfStampPairInputs(aHeader, aFirst, aSecond);
  CResultRaster aOutput(argv[4], aHeader);

  const int32_t aPixels = aFirst.pixels();
  CWindowRing aRing(aRows, aCols, aPixels, CTLRX_CORRELATION_CHANNELS);
  double *const aTerms[CTLRX_CORRELATION_CHANNELS] = {aRing.terms(0), aRing.terms(1), aRing.terms(2)};
  const double *const aSums[CTLRX_CORRELATION_CHANNELS] = {aRing.column(0), aRing.column(1), aRing.column(2)};
  std::vector<float> aLine(static_cast<size_t>(aPixels));
  SCorrelationStats aStats;
  CLineProgress aProgress(97.0, 2);
  fdfRunWindowSchedule(
      aRing, aFirst.lines(),
      [&](int32_t theLine) {
        aFirst.readLine(theLine);
        aSecond.readLine(theLine);
        aNorm.readLine(theLine);
        fdfCorrelationTerms(aFirst.values(), aFirst.mask(), aFirst.deliversIntensity(), aSecond.values(),
                            aSecond.mask(), aSecond.deliversIntensity(), aNorm.values(), aNorm.mask(), aPixels,
                            aTerms, aRing.centre(theLine));
      },
      [&](int32_t theLine) {
        fdfCorrelationLine(aSums, aRing.centre(theLine), aPixels, aNull, aLine.data(), aStats);
        aOutput.file().putLine(theLine, aLine.data());
      },
      [&](int32_t theLine, int32_t theLines) { aProgress.update(theLine, theLines); });
  aFirst.close();
  aSecond.close();
  aNorm.close();
  fdfTraceCorrelationStats(aStats);
  fdfTraceSignificantCount(aNull, aStats.mComputed);
  fdfTraceMessage("writing the output parameter file %s\n", argv[4]);
  aOutput.commit(aHeader, CTLRX_ERR_FILE_COPY);
  return 0;
}

int quick_and_dirty_close(int argc, char **argv) {
  fdfTraceMessage("\nSHUT\n");
  if (argc > 3)
    fdfDeleteRaster(argv[3], true, true);
  return 0;
}
