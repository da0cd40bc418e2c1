// Intensity coherence: x = I / n with n the normalisation image,
// r = X / sqrt(A B) over the window (X, A, B: sums of x1 x2, x1^2, x2^2),
// g = sqrt(2 r - 1) for r > 0.5, else 0. Formula, its bias, window, edges and
// no-data rules: tlrx_window_measures.h/.cpp and tlrx_window_sums.h.
#include "quick_and_dirty.h"

#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_step_common.h"
#include "tlrx_generic_utility.h"
#include "tlrx_result_files.h"
#include "tlrx_window_measures.h"
#include "tlrx_window_step.h"

namespace {

void fdfTraceCorrelationStats(const SCorrelationStats &theStats) {
  fdfTraceMessage("Number  =%lld\nNumber of  >0.8 =%lld\nNumber of  >0.7 =%lld\nNumber of  >0.5 =%lld\n"
                  "Number of  >0 =%lld\n",
                  static_cast<long long>(theStats.mComputed), static_cast<long long>(theStats.mAbove08),
                  static_cast<long long>(theStats.mAbove07), static_cast<long long>(theStats.mAbove05),
                  static_cast<long long>(theStats.mAbove0));
}

const SWindowStepSyntax CTLRX_CORRELATION_SYNTAX{
    "Texture Derodi program version 1.0 05-gen-2000\n", 7,
    [](int theArgc, char **theArgv) { fdfTracePairStepUsage(theArgc, theArgv, true); }, CTLRX_ERR_SETTING_MISSING,
    CTLRX_CLIPPED_WINDOW_RULE};

} // namespace

int quick_and_dirty(int argc, char **argv) {
  CWindowStep aStep(argc, argv, CTLRX_CORRELATION_SYNTAX);
  const int32_t aRows = aStep.windowArgument(6, "window rows");
  const int32_t aCols = aStep.windowArgument(7, "window columns");
  fdfTraceMessage("  input file 1 name   : %s\n  input file 2 name   : %s\n  Norm image file name  : %s\n"
                  "  output image file name  : %s\n  rows number in texture window : %d\n"
                  "  cols number in texture window : %d\n",
                  argv[1], argv[2], argv[3], argv[4], aRows, aCols);
  aStep.setWindow(aRows, aCols);

  aStep.addInputs({1, 2, 3});
  CWindowInput &aFirst = aStep.input(0);
  CWindowInput &aSecond = aStep.input(1);
  CWindowInput &aNorm = aStep.input(2);
  for (const CWindowInput *aInput : {&aFirst, &aSecond})
    if (aInput->deliversIntensity())
      fdfTraceMessage(" Intensity\n");
  aStep.openInputs();
  const float aNull = fdfGetDummyValue();
  CDescription aHeader;
  fdfMakeWindowResultHeader(aHeader, aFirst.header(), fdfGetDummyValueDouble(), "COHERENCE");
  fdfStampPairInputs(aHeader, aFirst, aSecond);
  CResultRaster aOutput(argv[4], aHeader);

  std::vector<SThreadCounter<SCorrelationStats>> aThreadStats(static_cast<size_t>(aStep.threads()));
  aStep.runLines(
      aOutput, CTLRX_CORRELATION_CHANNELS,
      [&](int32_t theLine, double *const *theTerms, uint8_t *theCentre) {
        fdfCorrelationTerms(aFirst.values(theLine), aFirst.mask(theLine), aFirst.deliversIntensity(),
                            aSecond.values(theLine), aSecond.mask(theLine), aSecond.deliversIntensity(),
                            aNorm.values(theLine), aNorm.mask(theLine), aFirst.pixels(), theTerms, theCentre);
      },
      [&](int theThread, const double *const *theSums, const uint8_t *theCentre, float *theOut) {
        fdfCorrelationLine(theSums, theCentre, aFirst.pixels(), aNull, theOut,
                           aThreadStats[static_cast<size_t>(theThread)].mValue);
      });
  SCorrelationStats aStats;
  for (const auto &aThread : aThreadStats)
    aStats += aThread.mValue;
  fdfTraceCorrelationStats(aStats);
  fdfTraceSignificantCount(aNull, aStats.mComputed);
  aStep.commit(aOutput, aHeader);
  return 0;
}

int quick_and_dirty_close(int argc, char **argv) {
  fdfTraceMessage("\nSHUT\n");
  if (argc > 3)
    fdfDeleteRaster(argv[3], true, true);
  return 0;
}
