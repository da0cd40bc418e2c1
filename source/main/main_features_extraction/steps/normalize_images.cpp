// Normalisation of an intensity pair: out = (S1 / n1 + S2 / n2) / 2 over the
// window of each pixel, the intensities being the squares of amplitude inputs
// or the values of "POWER" inputs. Formula, window, edges and no-data rules:
// tlrx_window_measures.h and tlrx_window_sums.h.
#include "normalize_images.h"

#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_step_common.h"
#include "tlrx_result_files.h"
#include "tlrx_window_measures.h"
#include "tlrx_window_step.h"

namespace {

const SWindowStepSyntax CTLRX_NORMALIZE_SYNTAX{
    "Texture Derodi program version 1.0 05-gen-2000\n", 6,
    [](int theArgc, char **theArgv) { fdfTracePairStepUsage(theArgc, theArgv, false); }, CTLRX_ERR_SETTING_MISSING,
    CTLRX_CLIPPED_WINDOW_RULE};

} // namespace

int normalize_images(int argc, char **argv) {
  CWindowStep aStep(argc, argv, CTLRX_NORMALIZE_SYNTAX);
  const double aDummy = aStep.realArgument(4, "dummy value", CTLRX_ERR_PARAMETER_FILE);
  const int32_t aRows = aStep.windowArgument(5, "window rows");
  const int32_t aCols = aStep.windowArgument(6, "window columns");
  fdfTraceMessage("  input file 1 name   : %s\n  input file 2 name   : %s\n  output image file name  : %s\n"
                  "  dummy value             :%g\n  rows number in texture window : %d\n"
                  "  cols number in texture window : %d\n",
                  argv[1], argv[2], argv[3], aDummy, aRows, aCols);
  aStep.setWindow(aRows, aCols);

  aStep.addInputs({1, 2});
  CWindowInput &aFirst = aStep.input(0);
  CWindowInput &aSecond = aStep.input(1);
  for (const CWindowInput *aInput : {&aFirst, &aSecond})
    if (aInput->deliversIntensity())
      fdfTraceMessage(" Intensity\n");
  aStep.openInputs();
  CDescription aHeader;
  fdfMakeWindowResultHeader(aHeader, aFirst.header(), aDummy, nullptr);
  CResultRaster aOutput(argv[3], aHeader);

  const float aNull = static_cast<float>(aDummy);
  std::vector<SThreadCounter<int64_t>> aComputed(static_cast<size_t>(aStep.threads()));
  aStep.runLines(
      aOutput, CTLRX_NORMALIZE_CHANNELS,
      [&](int32_t theLine, double *const *theTerms, uint8_t *theCentre) {
        fdfNormalizeTerms(aFirst.values(theLine), aFirst.mask(theLine), aFirst.deliversIntensity(),
                          aSecond.values(theLine), aSecond.mask(theLine), aSecond.deliversIntensity(), aFirst.pixels(),
                          theTerms, theCentre);
      },
      [&](int theThread, const double *const *theSums, const uint8_t *theCentre, float *theOut) {
        aComputed[static_cast<size_t>(theThread)].mValue +=
            fdfNormalizeLine(theSums, theCentre, aFirst.pixels(), aNull, theOut);
      });
  int64_t aTotal = 0;
  for (const auto &aCount : aComputed)
    aTotal += aCount.mValue;
  fdfTraceSignificantCount(aDummy, aTotal);
  aStep.commit(aOutput, aHeader);
  return 0;
}
