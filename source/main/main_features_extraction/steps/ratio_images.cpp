// Ratio of two co-registered images: out = a / b per pixel, or 10 log10(a / b)
// in decibels. A pixel is null (the program-wide dummy value) where either
// input holds its own null value or the divisor is not above the smallest
// normal float. Bands of a few lines per raster are held at a time, their
// lines computed in parallel.
#include "ratio_images.h"

#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_step_common.h"
#include "tlrx_generic_utility.h"
#include "tlrx_raster_file.h"
#include "tlrx_ratio_line.h"
#include "tlrx_result_files.h"
#include "tlrx_standard_header.h"
#include "tlrx_line_bands.h"
#include "tlrx_threads.h"
#include "tlrx_window_step.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <string>
#include <vector>

namespace {

constexpr const char *CTLRX_RATIO_SUFFIX = "_rto";
// Lines per piece of parallel work.
constexpr int32_t CTLRX_RATIO_BLOCK_LINES = 8;

// Printed classes; "Less than 0.01 " has no counting test and stays 0.
const char *const sHistogramLabels[CTLRX_RATIO_HISTOGRAM_CLASSES] = {
    "Less than -10 ",  "Less than - 1 ",   "Less than -0.1 ",   "Less than 0.01 ", "Less than 0.1 ",
    "Less than 1 ",    "Less than 10 ",    "Less than 100 ",    "Less than 1000 ", "Less than 10000 ",
    "Less than 100000 ", "Less than 1000000 ", "Other "};

std::string fdfRatioOutputName(const char *theName) {
  std::string aName(theName);
  const size_t aLen = std::strlen(CTLRX_RATIO_SUFFIX);
  if (aName.size() >= aLen && aName.compare(aName.size() - aLen, aLen, CTLRX_RATIO_SUFFIX) == 0)
    aName.erase(aName.size() - aLen);
  return aName + CTLRX_RATIO_SUFFIX;
}

void fdfTraceUsage(const char *theProgram) {
  fdfTraceMessage("Usage: %s <input> <output> <int_par> [ref_image]\n"
                  "  input\t\t\t  input image file name, short int/ or float\n"
                  "  output  \t\t  output image file name, float\n"
                  "  db              if the values should be in db (default = 0)\n",
                  theProgram);
}

} // namespace

int ratio_images(int argc, char **argv) {
  fdfTraceMessage("RATIO ");
  if (argc < 4) {
    fdfTraceUsage(argc > 0 ? argv[0] : "ratio_images");
    TLRX_RAISE(CTLRX_ERR_SETTING_MISSING, nullptr);
  }
  const std::string aOutput = fdfRatioOutputName(argv[3]);
  const bool aDecibel = argc > 4 && fdfIntegerToken(argv[4], "decibel switch", CTLRX_ERR_PARAMETER_FILE) != 0;
  if (argc > 4)
    fdfTraceMessage("  db == 1 if the values should be in db (default = 0)\n");
  fdfTraceMessage("  input file 1 name   : %s\n  input file 2 name   : %s\n  output image file name  : %s\n", argv[1],
                  argv[2], aOutput.c_str());
  if (aDecibel)
    fdfTraceMessage("  the out is in db \n");
  const float aNull = fdfGetDummyValue();

  CWindowInput aFirst(argv[1]);
  CWindowInput aSecond(argv[2]);
  for (const CWindowInput *aInput : {&aFirst, &aSecond})
    fdfTraceMessage(" Number of lines per image = %d\n Number of pixels per line = %d\n", aInput->lines(),
                    aInput->pixels());
  fdfCheckSameSize(aFirst, aSecond);
  aFirst.open();
  aSecond.open();
  CDescription aHeader;
  fdfMakeWindowResultHeader(aHeader, aFirst.header(), fdfGetDummyValueDouble(), "RATIO");
  fdfSetHeaderList(aHeader, "RasterInfo.FilesList", {argv[1], argv[2]});
  fdfStampPairInputs(aHeader, aFirst, aSecond);
  CResultRaster aOut(aOutput.c_str(), aHeader);

  const int32_t aLines = aFirst.lines();
  const int32_t aPixels = aFirst.pixels();
  const SBandPlan aPlan = fdfLineBandPlan(aLines, CTLRX_RATIO_BLOCK_LINES, fdfThreadCount());
  CBandLines<float> aBand1(aPlan.mBand, aPixels), aBand2(aPlan.mBand, aPixels), aResult(aPlan.mBand, aPixels);
  // Counts per thread, added up after the pass: integers, so in any order.
  std::vector<std::array<long long, CTLRX_RATIO_COUNTED_CLASSES>> aCounts(static_cast<size_t>(fdfThreadCount()));
  CLineProgress aProgress(99.0);
  fdfRunBands(
      aPlan, fdfParallelFor,
      [&](const SLineBand &theBand) {
        for (int32_t aLine = theBand.mFirst; aLine < theBand.mFirst + theBand.mCount; ++aLine) {
          aProgress.update(aLine, aLines);
          aFirst.readFloatLine(aLine, aBand1.line(aLine));
          aSecond.readFloatLine(aLine, aBand2.line(aLine));
        }
      },
      [&](int32_t theFirst, int32_t theCount, int theThread) {
        for (int32_t aLine = theFirst; aLine < theFirst + theCount; ++aLine)
          fdfRatioLine(aBand1.line(aLine), aFirst.nullValue(), aBand2.line(aLine), aSecond.nullValue(), aPixels,
                       aDecibel, aNull, aResult.line(aLine), aCounts[static_cast<size_t>(theThread)].data());
      },
      [&](const SLineBand &theBand) {
        for (int32_t aLine = theBand.mFirst; aLine < theBand.mFirst + theBand.mCount; ++aLine)
          aOut.file().putLine(aLine, aResult.line(aLine));
      });
  long long aHistogram[CTLRX_RATIO_COUNTED_CLASSES] = {};
  for (const auto &aThreadCounts : aCounts)
    for (int i = 0; i < CTLRX_RATIO_COUNTED_CLASSES; ++i)
      aHistogram[i] += aThreadCounts[static_cast<size_t>(i)];
  aFirst.close();
  aSecond.close();
  fdfTraceMessage("writing the output parameter file %s\n", aOutput.c_str());
  aOut.commit(aHeader, CTLRX_ERR_FILE_COPY);
  // The printed "0.01" line has no class of its own and shows 0.
  for (int i = 0, aClass = 0; i < CTLRX_RATIO_HISTOGRAM_CLASSES; ++i)
    fdfTraceMessage("%s%lld\n", sHistogramLabels[i], i == 3 ? 0LL : aHistogram[aClass++]);
  return 0;
}
