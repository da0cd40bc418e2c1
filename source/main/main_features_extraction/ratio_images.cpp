// Ratio of two co-registered images: out = a / b per pixel, or 10 log10(a / b)
// in decibels. A pixel is null (the program-wide dummy value) where either
// input holds its own null value or the divisor is not above the smallest
// normal float. One line of each raster is held at a time.
#include "ratio_images.h"

#include "tlrx_description_xml.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_features_common.h"
#include "tlrx_generic_utility.h"
#include "tlrx_raster_file.h"
#include "tlrx_standard_header.h"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

namespace {

constexpr double CTLRX_EPS = 1.1754943508222875e-38;
constexpr const char *CTLRX_RATIO_SUFFIX = "_rto";

const double theHistogramLimits[] = {-10, -1, -0.1, 0.1, 1, 10, 100, 1000, 10000, 100000, 1000000};
// Printed classes; "Less than 0.01 " has no counting test and stays 0.
const char *const theHistogramLabels[CTLRX_RATIO_HISTOGRAM_CLASSES] = {
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

struct SRatioInput {
  CDescription mHeader;
  double mNull = 0.0;
  int32_t mLines = 0;
  int32_t mPixels = 0;
};

void fdfLoadRatioInput(const char *theName, SRatioInput &theInput) {
  fdfLoadInputHeader(theName, theInput.mHeader);
  theInput.mNull = fdfHeaderNullValue(theInput.mHeader);
  theInput.mLines = fdfHeaderInteger(theInput.mHeader, "RasterInfo.NrOfLinesPerImage");
  theInput.mPixels = fdfHeaderInteger(theInput.mHeader, "RasterInfo.NrOfPixelsPerLine");
  fdfTraceMessage(" Number of lines per image = %d\n Number of pixels per line = %d\n", theInput.mLines,
                  theInput.mPixels);
}

void fdfCheckSameSize(const SRatioInput &theFirst, const SRatioInput &theSecond) {
  if (theSecond.mLines != theFirst.mLines) {
    fdfTraceMessage("Error: The number of lines does not match (%d , %d)\n", theFirst.mLines, theSecond.mLines);
    TLRX_RAISE(652807, nullptr);
  }
  if (theSecond.mPixels != theFirst.mPixels) {
    fdfTraceMessage("Error: The number of pixels per line does not match (%d , %d)\n", theFirst.mPixels,
                    theSecond.mPixels);
    TLRX_RAISE(652807, nullptr);
  }
}

// The result header: input 1's header made a float ratio raster of the pair.
void fdfMakeRatioHeader(CDescription &theHeader, const SRatioInput &theFirst, const SRatioInput &theSecond,
                        const char *theName1, const char *theName2) {
  fdfDeclareStandardHeader(theHeader);
  theHeader = theFirst.mHeader;
  fdfSetHeaderText(theHeader, "RasterInfo.DataUnits", "RATIO");
  fdfSetHeaderNumber(theHeader, "RasterInfo.HeaderOffset", 0);
  fdfSetHeaderNumber(theHeader, "RasterInfo.RowPrefix", 0);
  fdfSetHeaderNumber(theHeader, "RasterInfo.RowSuffix", 0);
  fdfSetHeaderText(theHeader, "RasterInfo.CellType", "FLOAT");
  fdfSetHeaderNumber(theHeader, "RasterInfo.NullCellValue", fdfGetDummyValueDouble());
  fdfSetHeaderNumber(theHeader, "RasterInfo.NrOfLinesPerImage", theFirst.mLines);
  fdfSetHeaderNumber(theHeader, "RasterInfo.NrOfPixelsPerLine", theFirst.mPixels);
  fdfSetHeaderList(theHeader, "RasterInfo.FilesList", {theName1, theName2});
  std::string aTime;
  if (fdfFindOtherInfo(theFirst.mHeader, CTLRX_ACQUISITION_TIME_KEY, aTime)) {
    fdfStampOtherInfo(theHeader, "ACQUISITION TIME", aTime.c_str());
    fdfStampOtherInfo(theHeader, "MASTER ACQUISITION TIME", aTime.c_str());
  }
  if (fdfFindOtherInfo(theSecond.mHeader, CTLRX_ACQUISITION_TIME_KEY, aTime))
    fdfStampOtherInfo(theHeader, "SLAVE ACQUISITION TIME", aTime.c_str());
}

void fdfTraceUsage(const char *theProgram) {
  fdfTraceMessage("Usage: %s <input> <output> <int_par> [ref_image]\n"
                  "  input\t\t\t  input image file name, short int/ or float\n"
                  "  output  \t\t  output image file name, float\n"
                  "  db              if the values should be in db (default = 0)\n",
                  theProgram);
}

} // namespace

int fdfRatioHistogramClass(double theValue) {
  int aClass = 0;
  for (double aLimit : theHistogramLimits) {
    if (theValue < aLimit)
      return aClass < 3 ? aClass : aClass + 1; // skip the "0.01" line
    ++aClass;
  }
  return CTLRX_RATIO_HISTOGRAM_CLASSES - 1;
}

float fdfRatioPixel(double theA, double theNullA, double theB, double theNullB, bool theDecibel, float theNull) {
  if (fdfIsNull(theA, theNullA) || fdfIsNull(theB, theNullB) || theB <= CTLRX_EPS)
    return theNull;
  const double aRatio = theA / theB;
  return static_cast<float>(theDecibel ? 10.0 * std::log10(aRatio) : aRatio);
}

int ratio_images(int argc, char **argv) {
  fdfTraceMessage("RATIO ");
  if (argc < 4) {
    fdfTraceUsage(argc > 0 ? argv[0] : "ratio_images");
    TLRX_RAISE(CTLRX_ERR_SETTING_MISSING, nullptr);
  }
  const std::string aOutput = fdfRatioOutputName(argv[3]);
  const bool aDecibel = argc > 4 && std::atoi(argv[4]) != 0;
  if (argc > 4)
    fdfTraceMessage("  db == 1 if the values should be in db (default = 0)\n");
  fdfTraceMessage("  input file 1 name   : %s\n  input file 2 name   : %s\n  output image file name  : %s\n", argv[1],
                  argv[2], aOutput.c_str());
  if (aDecibel)
    fdfTraceMessage("  the out is in db \n");
  const float aNull = fdfGetDummyValue();

  SRatioInput aFirst, aSecond;
  fdfLoadRatioInput(argv[1], aFirst);
  fdfLoadRatioInput(argv[2], aSecond);
  fdfCheckSameSize(aFirst, aSecond);

  CRasterFile aIn1, aIn2, aOut;
  aIn1.open_read(argv[1], aFirst.mHeader);
  aIn2.open_read(argv[2], aSecond.mHeader);
  fdfTraceMessage("  Max bytes per pixel = %d\n", std::max(aIn1.getBytesPerPixel(), aIn2.getBytesPerPixel()));
  CDescription aHeader;
  fdfMakeRatioHeader(aHeader, aFirst, aSecond, argv[1], argv[2]);
  aOut.open_write(aOutput.c_str(), aHeader);

  const int32_t aLines = aFirst.mLines;
  const int32_t aPixels = aFirst.mPixels;
  std::vector<float> aLine1(aPixels), aLine2(aPixels), aResult(aPixels);
  long long aHistogram[CTLRX_RATIO_HISTOGRAM_CLASSES] = {};
  CLineProgress aProgress(99.0);
  for (int32_t aLine = 0; aLine < aLines; ++aLine) {
    aProgress.update(aLine, aLines);
    aIn1.getLine(aLine1.data(), aLine);
    aIn2.getLine(aLine2.data(), aLine);
    for (int32_t i = 0; i < aPixels; ++i) {
      aResult[i] = fdfRatioPixel(aLine1[i], aFirst.mNull, aLine2[i], aSecond.mNull, aDecibel, aNull);
      ++aHistogram[fdfRatioHistogramClass(aResult[i])];
    }
    aOut.putLine(aLine, aResult.data());
  }
  aIn1.close();
  aIn2.close();
  aOut.close();
  fdfTraceMessage("writing the output parameter file %s\n", aOutput.c_str());
  fdfWriteResultHeader(aOutput, aHeader, CTLRX_ERR_FILE_COPY);
  for (int i = 0; i < CTLRX_RATIO_HISTOGRAM_CLASSES; ++i)
    fdfTraceMessage("%s%lld\n", theHistogramLabels[i], aHistogram[i]);
  return 0;
}
