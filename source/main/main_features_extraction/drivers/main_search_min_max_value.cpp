// Min and max over a stack: one pass over the lines of every input, in
// chronological order. A pixel that is no data in any input is no data in
// every result (value N, date class 0); ties keep the earlier date.
#include "main_search_min_max_value.h"

#include "tlrx_acquisition_dates.h"
#include "tlrx_description_xml.h"
#include "tlrx_driver_guard.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_step_common.h"
#include "tlrx_generic_utility.h"
#include "tlrx_min_max_line.h"
#include "tlrx_raster_to_geotiff.h"
#include "tlrx_raster_file.h"
#include "tlrx_result_files.h"
#include "tlrx_standard_header.h"
#include "tlrx_line_bands.h"
#include "tlrx_threads.h"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <cstring>
#include <memory>

namespace {

constexpr int CTLRX_MINMAX_TOKENS = 9;
constexpr int CTLRX_MINMAX_LIST = 0;
constexpr int CTLRX_MINMAX_ROOT = 1;
constexpr int CTLRX_MINMAX_TIFF = 7;
constexpr int CTLRX_MINMAX_SATURATION = 8;
constexpr int CTLRX_PALETTE_SIZE = 256;
// Lines per piece of parallel work.
constexpr int32_t CTLRX_MINMAX_BLOCK_LINES = 8;

// The four results, in the order they are written and converted.
const char *const sResultSuffixes[4] = {"_min", "_max", "_min_date", "_max_date"};

std::string fdfJoin(const std::vector<std::string> &theTokens) {
  std::string aText;
  for (const std::string &aToken : theTokens)
    aText += (aText.empty() ? "" : " ") + aToken;
  return aText;
}

void fdfClearField(CDescription &theHeader, const char *theKey) {
  if (CDescriptionField *aField = theHeader.findField(theKey))
    aField->clear();
}

void fdfMakeValueHeader(CDescription &theHeader) {
  for (const char *aKey : {"RasterInfo.TiffLUTRed", "RasterInfo.TiffLUTGreen", "RasterInfo.TiffLUTBlue"})
    fdfClearField(theHeader, aKey);
  fdfSetHeaderText(theHeader, "RasterInfo.CellType", "FLOAT");
  fdfSetHeaderText(theHeader, "RasterInfo.DataUnits", "NUMBER");
}

void fdfMakeDateHeader(CDescription &theHeader, const std::vector<STLRXDate> &theDates) {
  const int32_t aClasses = static_cast<int32_t>(theDates.size()) + 1;
  fdfSetHeaderText(theHeader, "RasterInfo.DataUnits", "CLASSIFICATION");
  CDescriptionField &aData = theHeader.getField("RasterInfo.ClassificationData");
  aData.setNumberOfElements(aClasses);
  std::vector<std::string> aNames = {"No classified"};
  for (int32_t i = 0; i < aClasses; ++i)
    aData.setInteger(i, i);
  for (const STLRXDate &aDate : theDates)
    aNames.push_back(fdfDateText(aDate));
  fdfSetHeaderList(theHeader, "RasterInfo.ClassificationName", aNames);
  CDescriptionField &aRed = theHeader.getField("RasterInfo.TiffLUTRed");
  CDescriptionField &aGreen = theHeader.getField("RasterInfo.TiffLUTGreen");
  CDescriptionField &aBlue = theHeader.getField("RasterInfo.TiffLUTBlue");
  for (CDescriptionField *aLut : {&aRed, &aGreen, &aBlue}) {
    aLut->setNumberOfElements(CTLRX_PALETTE_SIZE);
    for (int32_t i = 0; i < CTLRX_PALETTE_SIZE; ++i)
      aLut->setInteger(i, 0);
  }
  for (int32_t i = 1; i < aClasses && i < CTLRX_PALETTE_SIZE; ++i) {
    int aR, aG, aB;
    fdfDateClassColour(i, aR, aG, aB);
    aRed.setInteger(i, aR);
    aGreen.setInteger(i, aG);
    aBlue.setInteger(i, aB);
  }
}


int32_t fdfRunMinMax(const char *theArguments) {
  const std::vector<std::string> aTokens = fdfStartArgumentCommand(theArguments, "Min and Max");
  if (aTokens.size() < CTLRX_MINMAX_TOKENS)
    TLRX_RAISE(CTLRX_ERR_ARGUMENTS, fdfJoin(aTokens).c_str());
  const bool aTiff = fdfIsSwitchOn(aTokens[CTLRX_MINMAX_TIFF]);
  // A bad saturation stops the run before any result is written.
  const double aSaturation =
      aTiff ? fdfRealToken(aTokens[CTLRX_MINMAX_SATURATION].c_str(), "saturation", CTLRX_ERR_PARAMETER_FILE) : 0.0;
  std::vector<std::string> aNames = fdfReadNameList(aTokens[CTLRX_MINMAX_LIST].c_str());
  if (aNames.size() < 2) {
    fdfTraceMessage("aNumberOfFiles = %d\n", static_cast<int>(aNames.size()));
    TLRX_RAISE(CTLRX_ERR_ARGUMENTS, aTokens[CTLRX_MINMAX_LIST].c_str());
  }
  const int32_t aInputs = static_cast<int32_t>(aNames.size());

  CDescription aValueHeader;
  fdfLoadInputHeader(aNames[0], aValueHeader);
  const std::vector<STLRXDate> aDates = fdfOrderChronologically(aNames);

  const std::string &aRoot = aTokens[CTLRX_MINMAX_ROOT];
  std::vector<std::string> aResults;
  CRunFiles aFiles;
  aFiles.addRead(theArguments);
  aFiles.addRead(aTokens[CTLRX_MINMAX_LIST]);
  for (const char *aSuffix : sResultSuffixes) {
    aResults.push_back(aRoot + aSuffix);
    aFiles.addResult(aResults.back(), aTiff);
  }
  for (const std::string &aName : aNames)
    aFiles.addInput(aName);
  aFiles.refuseClashes(CTLRX_ERR_ARGUMENTS);
  fdfMakeValueHeader(aValueHeader);
  CDescription aDateHeader;
  fdfDeclareStandardHeader(aDateHeader);
  aDateHeader = aValueHeader;
  fdfMakeDateHeader(aDateHeader, aDates);
  CDescription *const aHeaders[4] = {&aValueHeader, &aValueHeader, &aDateHeader, &aDateHeader};

  std::vector<std::unique_ptr<CRasterFile>> aIn;
  std::vector<double> aNulls;
  for (int32_t i = 0; i < aInputs; ++i) {
    aIn.push_back(std::make_unique<CRasterFile>());
    aIn[i]->open_read(aNames[i].c_str());
    aNulls.push_back(aIn[i]->getDummyVal());
    if (aIn[i]->getNrOfLinesPerImage() != aIn[0]->getNrOfLinesPerImage())
      TLRX_RAISE(CTLRX_ERR_LINES_DIFFER, aNames[i].c_str());
    if (aIn[i]->getNrOfPixelsPerLine() != aIn[0]->getNrOfPixelsPerLine())
      TLRX_RAISE(CTLRX_ERR_PIXELS_DIFFER, aNames[i].c_str());
  }
  const int32_t aLines = aIn[0]->getNrOfLinesPerImage();
  const int32_t aPixels = aIn[0]->getNrOfPixelsPerLine();
  std::vector<std::unique_ptr<CResultRaster>> aOut;
  for (int k = 0; k < 4; ++k) {
    aOut.push_back(std::make_unique<CResultRaster>(aResults[k], *aHeaders[k]));
  }
  const float aNull = static_cast<float>(aOut[0]->file().getDummyVal());

  const SBandPlan aPlan = fdfLineBandPlan(aLines, CTLRX_MINMAX_BLOCK_LINES, fdfThreadCount());
  std::vector<CBandLines<float>> aInBand(static_cast<size_t>(aInputs), CBandLines<float>(aPlan.mBand, aPixels));
  std::vector<CBandLines<float>> aOutBand(4, CBandLines<float>(aPlan.mBand, aPixels));
  // Per thread: the input lines of the pixel row in hand and the validity flags.
  const size_t aThreads = static_cast<size_t>(fdfThreadCount());
  std::vector<std::vector<const float *>> aRows(aThreads, std::vector<const float *>(aInBand.size()));
  std::vector<std::vector<uint8_t>> aValid(aThreads, std::vector<uint8_t>(aPixels));
  CLineProgress aProgress(50.0);
  fdfRunBands(
      aPlan, fdfParallelFor,
      [&](const SLineBand &theBand) {
        for (int32_t l = theBand.mFirst; l < theBand.mFirst + theBand.mCount; ++l) {
          aProgress.update(l, aLines);
          for (int32_t i = 0; i < aInputs; ++i)
            aIn[i]->getLine(aInBand[i].line(l), l);
        }
      },
      [&](int32_t theFirst, int32_t theCount, int theThread) {
        std::vector<const float *> &aLineRows = aRows[static_cast<size_t>(theThread)];
        for (int32_t l = theFirst; l < theFirst + theCount; ++l) {
          for (size_t i = 0; i < aInBand.size(); ++i)
            aLineRows[i] = aInBand[i].line(l);
          fdfMinMaxLine(aLineRows, aNulls, aPixels, aNull, aValid[static_cast<size_t>(theThread)],
                        {aOutBand[0].line(l), aOutBand[1].line(l), aOutBand[2].line(l), aOutBand[3].line(l)});
        }
      },
      [&](const SLineBand &theBand) {
        for (int32_t l = theBand.mFirst; l < theBand.mFirst + theBand.mCount; ++l)
          for (int k = 0; k < 4; ++k)
            aOut[k]->file().putLine(l, aOutBand[static_cast<size_t>(k)].line(l));
      });
  for (auto &aRaster : aIn)
    aRaster->close();
  for (int k = 0; k < 4; ++k)
    aOut[k]->commit(*aHeaders[k], CTLRX_ERR_FILE_WRITE);

  if (aTiff)
    for (const std::string &aResult : aResults) {
      fdfSetProcessName("Generate tiff ...");
      getAndSetPerc(-1, 0, nullptr);
      fdfRasterQuickLook(aResult.c_str(), aSaturation);
    }
  return 0;
}

} // namespace


void fdfDateClassColour(int theClass, int &theRed, int &theGreen, int &theBlue) {
  theRed = (5 * theClass) % 150 + 100;
  theGreen = (15 * theClass) % 250;
  theBlue = (5 * theClass) % 100 + 150;
}

int32_t main_search_min_max_value(const char *theArguments) { return fdfRunGuardedDriver(fdfRunMinMax, theArguments); }
