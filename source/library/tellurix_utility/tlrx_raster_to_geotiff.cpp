// GeoTIFF quick-looks of rasters: sample statistics, stretch, striped 8-bit
// GeoTIFF, and the TIFF's own header.
#include "tlrx_raster_to_geotiff.h"

#include "tlrx_cell_types.h"
#include "tlrx_description_xml.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"
#include "tlrx_geotiff_file.h"
#include "tlrx_pending_files.h"
#include "tlrx_geotiff_georef.h"
#include "tlrx_geotiff_source.h"
#include "tlrx_header_numbers.h"
#include "tlrx_geotiff_stretch.h"
#include "tlrx_raster_file.h"
#include "tlrx_standard_header.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>
#include <sys/stat.h>
#include <vector>

namespace {

constexpr int sSamplePassEnd = 15;  // percent at the end of the sample pass
constexpr int sWritePassStart = 30; // the histogram pass fills the gap
constexpr int32_t sSampleStep = 2;

// The arguments after their rules.
struct STiffRequest {
  std::string mInput;
  std::string mTiff;
  double mSaturation;
  int32_t mRowFactor;
  int32_t mColFactor;
  double mGain;
  double mExponent;
  bool mInvertRows;
  bool mInvertCols;
  bool mHistogram;
  int32_t mLevels;
  int32_t mHistogramSize;
  const double *mForcedMin;
  const double *mForcedMax;
  int32_t mWindow[4]; // first row, last row, first column, last column; -1 automatic
};

struct SSampleWindow {
  int32_t mRowStart;
  int32_t mRowEnd;
  int32_t mColStart;
  int32_t mColEnd;
};

// Sends a progress value when it changes.
class CProgress {
public:
  void set(int thePercent) {
    if (thePercent == mLast)
      return;
    getAndSetPerc(mLast, thePercent);
    mLast = thePercent;
  }
  void span(int theFirst, int theLast, int64_t theDone, int64_t theTotal) {
    set(theFirst + static_cast<int>((theLast - theFirst) * theDone / std::max<int64_t>(theTotal, 1)));
  }

private:
  int mLast = -1;
};

// ------------------------------------------------------------ header fields

bool holdsScalar(const CDescription &theHeader, const char *theKey) {
  const CDescriptionField *aField = theHeader.findField(theKey);
  return aField != nullptr && aField->getShape() == CTLRX_DS_SCALAR && aField->holdsValue();
}

bool switchIsOn(const CDescription &theHeader, const char *theKey) {
  if (!holdsScalar(theHeader, theKey) || theHeader.getField(theKey).getValueType() != CTLRX_DS_STRING)
    return false;
  return fdfIsSwitchOn(theHeader.getField(theKey).getString());
}

void loadInputHeader(const std::string &theInput, CDescription &theHeader) {
  fdfDeclareStandardHeader(theHeader);
  if (!theHeader.readFromFile(theInput.c_str(), false)) {
    const std::string aHeaderName = fdfHeaderFileName(theInput);
    fdfTraceMessage("Error: missing parameter file %s\n", aHeaderName.c_str());
    TLRX_RAISE_F(CTLRX_ERR_TIFF_HEADER_MISSING, "Error: missing parameter file %s", aHeaderName.c_str());
  }
}

void openInputRaster(const std::string &theInput, const CDescription &theHeader, CRasterFile &theRaster) {
  // A data file that cannot be read is this conversion's failure, reported
  // before the raster file would report it as its own.
  FILE *aProbe = fdfIsRegularFile(theInput.c_str()) ? std::fopen(theInput.c_str(), "rb") : nullptr;
  if (aProbe != nullptr) {
    std::fclose(aProbe);
    theRaster.open_read(theInput.c_str(), theHeader);
  }
  if (theRaster.getRasterStatus() != CTLRX_RF_OPEN_READ) {
    fdfTraceMessage("Wrong CRasterFile Status\n");
    TLRX_RAISE_F(CTLRX_ERR_TIFF_RASTER_OPEN, "Wrong CRasterFile Status %s", theInput.c_str());
  }
}

// ------------------------------------------------------------ sample

int32_t boundOr(int32_t theGiven, int32_t theAutomatic, int32_t theSize) {
  const int32_t aBound = theGiven < 0 ? theAutomatic : theGiven;
  return std::min(std::max(aBound, 0), theSize - 1);
}

// The central third unless the caller gives a bound.
SSampleWindow sampleWindow(const STiffRequest &theRequest, int32_t theRows, int32_t theCols) {
  SSampleWindow aWindow{boundOr(theRequest.mWindow[0], theRows / 2 - theRows / 6, theRows),
                        boundOr(theRequest.mWindow[1], theRows / 2 + theRows / 6, theRows),
                        boundOr(theRequest.mWindow[2], theCols / 2 - theCols / 6, theCols),
                        boundOr(theRequest.mWindow[3], theCols / 2 + theCols / 6, theCols)};
  fdfTraceMessage("\naSampleRowStart = %d\naSampleRowEnd = %d\naSampleColStart = %d\naSampleColEnd = %d\n"
                  "aSampleInc = %d\n",
                  aWindow.mRowStart, aWindow.mRowEnd, aWindow.mColStart, aWindow.mColEnd, sSampleStep);
  return aWindow;
}

// Calls theUse(value, re, im, isComplex) for every valid sample cell.
template <typename F>
void walkSample(CTiffLineSource &theSource, const SSampleWindow &theWindow, CProgress &theProgress, int theFirst,
                int theLast, F theUse) {
  if (theWindow.mRowStart > theWindow.mRowEnd || theWindow.mColStart > theWindow.mColEnd)
    return;
  const int64_t aRows = (theWindow.mRowEnd - theWindow.mRowStart) / sSampleStep + 1;
  int64_t aDone = 0;
  for (int32_t aRow = theWindow.mRowStart; aRow <= theWindow.mRowEnd; aRow += sSampleStep, ++aDone) {
    theProgress.span(theFirst, theLast, aDone, aRows);
    theSource.read(aRow, theWindow.mColStart, theWindow.mColEnd);
    const int32_t aCount = theWindow.mColEnd - theWindow.mColStart + 1;
    for (int32_t i = 0; i < aCount; i += sSampleStep) {
      if (theSource.valid()[i] == 0)
        continue;
      if (theSource.isComplex())
        theUse(theSource.values()[i], theSource.re()[i], theSource.im()[i], true);
      else
        theUse(theSource.values()[i], 0.0, 0.0, false);
    }
  }
}

CTiffSample takeSample(CTiffLineSource &theSource, const SSampleWindow &theWindow, CProgress &theProgress,
                       const std::string &theInput) {
  CTiffSample aSample;
  walkSample(theSource, theWindow, theProgress, 0, sSamplePassEnd,
             [&aSample](double theValue, double theRe, double theIm, bool theComplex) {
               aSample.add(theValue);
               if (theComplex)
                 aSample.addParts(theRe, theIm);
             });
  if (aSample.count() == 0) {
    fdfTraceMessage("Error: 0 non null points in the input file \n");
    TLRX_RAISE_F(CTLRX_ERR_TIFF_EMPTY_SAMPLE, "Error: 0 non null points in the input file : %s", theInput.c_str());
  }
  if (aSample.hasParts())
    fdfTraceMessage("Real mean      : %g\nIm mean      : %g\n", aSample.realMean(), aSample.imaginaryMean());
  fdfTraceMessage("Mean     : %g\nSTDV     : %g\n", aSample.mean(), aSample.stdv());
  return aSample;
}

[[noreturn]] void failHistogram(const char *theWhy, const std::string &theInput) {
  fdfTraceMessage("Histogram error : %s\n", theWhy);
  TLRX_RAISE_F(CTLRX_ERR_TIFF_HISTOGRAM, "Histogram error %s", theInput.c_str());
}

void traceHistogram(const CTiffHistogramLut &theLut) {
  if (!fdfIsTracing())
    return;
  fdfTraceMessage("\n\nHISTOGRAM FREQUENCY : START\n");
  for (int32_t aLevel = 0; aLevel <= theLut.levels(); ++aLevel)
    fdfTraceMessage("%3d  %g\n", aLevel, theLut.levelValue(aLevel));
  fdfTraceMessage("\n\nHISTOGRAM FREQUENCY : END \n\n");
}

std::unique_ptr<CTiffHistogramLut> buildHistogram(const STiffRequest &theRequest, const CTiffSample &theSample,
                                                  CTiffLineSource &theSource, const SSampleWindow &theWindow,
                                                  CProgress &theProgress) {
  if (!CTiffHistogramLut::validClassCount(theRequest.mHistogramSize))
    failHistogram("number of classes outside 2..2097152", theRequest.mInput);
  const double aLow = theRequest.mForcedMin != nullptr ? *theRequest.mForcedMin : theSample.minimum();
  const double aHigh = theRequest.mForcedMax != nullptr ? *theRequest.mForcedMax : theSample.maximum();
  if (!std::isfinite(aLow) || !std::isfinite(aHigh) || aHigh < aLow)
    failHistogram("no usable value range", theRequest.mInput);
  auto aLut = std::make_unique<CTiffHistogramLut>(aLow, aHigh, theRequest.mHistogramSize, theRequest.mLevels);
  walkSample(theSource, theWindow, theProgress, sSamplePassEnd, sWritePassStart,
             [&aLut](double theValue, double, double, bool) { aLut->add(theValue); });
  if (!aLut->equalise())
    failHistogram("empty histogram", theRequest.mInput);
  traceHistogram(*aLut);
  return aLut;
}

// The values of the levels, for readers of a histogram-stretched quick-look.
std::string levelValuesText(const CTiffHistogramLut &theLut) {
  std::string aText;
  char aValue[40];
  for (int32_t aLevel = 0; aLevel <= theLut.levels(); ++aLevel) {
    std::snprintf(aValue, sizeof aValue, aLevel == 0 ? "%.9g" : " %.9g", theLut.levelValue(aLevel));
    aText += aValue;
  }
  return aText;
}

// ------------------------------------------------------------ palette

// Interferograms without a usable palette in their header get a colour
// wheel: one turn of hue over the data levels, black for the null level.
void colourWheel(std::vector<uint16_t> theRgb[3]) {
  for (int k = 0; k < CTLRX_TIFF_PALETTE_SIZE; ++k) {
    double aRgb[3] = {0.0, 0.0, 0.0};
    if (k != CTLRX_TIFF_NULL_LEVEL) {
      const double aHue = 6.0 * k / CTLRX_TIFF_NULL_LEVEL; // red at 0, green at 2, blue at 4
      aRgb[0] = std::clamp(std::fabs(aHue - 3.0) - 1.0, 0.0, 1.0);
      aRgb[1] = std::clamp(2.0 - std::fabs(aHue - 2.0), 0.0, 1.0);
      aRgb[2] = std::clamp(2.0 - std::fabs(aHue - 4.0), 0.0, 1.0);
    }
    for (int c = 0; c < 3; ++c)
      theRgb[c][static_cast<size_t>(k)] = static_cast<uint16_t>(std::lround(aRgb[c] * 255.0) * 257);
  }
}

// 8-bit palette entries of the header, widened to TIFF's 16 bits (x 257).
bool headerPalette(const CDescription &theHeader, std::vector<uint16_t> theRgb[3]) {
  static const char *const aKeys[3] = {"RasterInfo.TiffLUTRed", "RasterInfo.TiffLUTGreen", "RasterInfo.TiffLUTBlue"};
  for (int c = 0; c < 3; ++c) {
    const CDescriptionField *aField = theHeader.findField(aKeys[c]);
    if (aField == nullptr || aField->getShape() != CTLRX_DS_VECTOR || aField->getValueType() != CTLRX_DS_INTEGER ||
        !aField->holdsValue() || aField->getColNbr() < CTLRX_TIFF_PALETTE_SIZE)
      return false;
    for (int k = 0; k < CTLRX_TIFF_PALETTE_SIZE; ++k)
      theRgb[c][static_cast<size_t>(k)] = static_cast<uint16_t>(std::clamp(aField->getInteger(k), 0, 255) * 257);
  }
  return true;
}

void writePhotometric(CGeoTiffFile &theTiff, ETLRXTiffFamily theFamily, const CDescription &theHeader) {
  if (!fdfTiffUsesPalette(theFamily)) {
    theTiff.writeMinIsBlack();
    return;
  }
  fdfTraceMessage("GENERATE TIFF with LUT\n");
  std::vector<uint16_t> aRgb[3];
  for (auto &aColour : aRgb)
    aColour.assign(CTLRX_TIFF_PALETTE_SIZE, 0);
  if (!headerPalette(theHeader, aRgb)) {
    fdfTraceMessage("No 256-entry TiffLUTRed/Green/Blue in the header: colour wheel used\n");
    colourWheel(aRgb);
  }
  theTiff.writePalette(aRgb[0], aRgb[1], aRgb[2]);
}

// ------------------------------------------------------------ writing pass

void writeRows(CGeoTiffFile &theTiff, CTiffLineSource &theSource, const STLRXTiffGrid &theGrid,
               const STLRXStretch &theStretch, ETLRXBlockRule theRule, CProgress &theProgress) {
  CTiffBlockReducer aReducer(theRule, theGrid.mOutCols, theGrid.mColFactor);
  const size_t aOutCols = static_cast<size_t>(theGrid.mOutCols);
  std::vector<double> aValues(aOutCols);
  std::vector<uint8_t> aValid(aOutCols);
  std::vector<uint8_t> aGrey(aOutCols);
  const int32_t aLastCol = theGrid.mOutCols * theGrid.mColFactor - 1;
  for (int32_t aRow = 0; aRow < theGrid.mOutRows; ++aRow) {
    theProgress.span(sWritePassStart, 100, aRow, theGrid.mOutRows);
    const int32_t aBlock = theGrid.mInvertRows ? theGrid.mOutRows - 1 - aRow : aRow;
    const int32_t aFirst = aBlock * theGrid.mRowFactor;
    aReducer.startBlock();
    if (theRule == ETLRXBlockRule::kCentre) {
      theSource.read(aFirst + theGrid.mRowFactor / 2, 0, aLastCol);
      aReducer.addRow(theSource.values(), theSource.valid());
    } else {
      for (int32_t r = 0; r < theGrid.mRowFactor; ++r) {
        theSource.read(aFirst + r, 0, aLastCol);
        aReducer.addRow(theSource.values(), theSource.valid());
      }
    }
    aReducer.finishBlock(aValues.data(), aValid.data());
    fdfStretchLine(theStretch, aValues.data(), aValid.data(), theGrid.mOutCols, aGrey.data());
    if (theGrid.mInvertCols)
      std::reverse(aGrey.begin(), aGrey.end());
    theTiff.writeScanline(aGrey.data(), static_cast<uint32_t>(aRow));
  }
}

// ------------------------------------------------------------ the TIFF's header

void scaleSpacing(CDescription &theHeader, const char *theKey, int32_t theFactor) {
  if (holdsScalar(theHeader, theKey) && theHeader.getField(theKey).getValueType() == CTLRX_DS_DOUBLE)
    theHeader.getField(theKey) = theHeader.getField(theKey).getDouble() * theFactor;
}

// The raster's header, made to describe the quick-look and its stretch.
void storeTiffKeys(CDescription &theHeader, const STLRXStretch &theStretch, const STLRXTiffGrid &theGrid,
                   const CTiffHistogramLut *theLut) {
  theHeader.getField("RasterInfo.TiffMinValue") = theStretch.mOrigin;
  theHeader.getField("RasterInfo.TiffMaxValue") = theStretch.maxValue();
  theHeader.getField("RasterInfo.NullCellValue") = static_cast<double>(CTLRX_TIFF_NULL_LEVEL);
  theHeader.getField("RasterInfo.TiffScale") = theStretch.mScale;
  theHeader.getField("RasterInfo.TiffExponent") = theStretch.mExponent;
  theHeader.getField("RasterInfo.TiffRowScale") = theGrid.mRowFactor;
  theHeader.getField("RasterInfo.TiffColScale") = theGrid.mColFactor;
  theHeader.getField("RasterInfo.CellType") = fdfCellTypeName(CTLRX_CELL_UNSIGNED_BYTE);
  theHeader.getField("RasterInfo.NrOfLinesPerImage") = theGrid.mOutRows;
  theHeader.getField("RasterInfo.NrOfPixelsPerLine") = theGrid.mOutCols;
  scaleSpacing(theHeader, "RegistrationCoordinates.PixelSpacingLatNorth", theGrid.mRowFactor);
  scaleSpacing(theHeader, "RegistrationCoordinates.PixelSpacingLonEast", theGrid.mColFactor);
  if (theLut != nullptr)
    fdfStampOtherInfo(theHeader, "TiffLevelValues", levelValuesText(*theLut).c_str());
  fdfDeriveDemBox(theHeader);
}

// Written as XML only: an ENVI header beside a TIFF would describe it wrongly.
std::string writeTiffHeader(CDescription &theHeader, const std::string &theTiff) {
  const std::string aName = fdfXmlHeaderFileName(theTiff + "_hdr");
  if (!theHeader.writeXML(aName.c_str(), true, false)) {
    struct stat aStatus;
    if (stat(aName.c_str(), &aStatus) == 0 && S_ISREG(aStatus.st_mode))
      std::remove(aName.c_str()); // a partly written header
    fdfTraceMessage("Error while writing parameter file %s\n", aName.c_str());
    TLRX_RAISE_F(CTLRX_ERR_TIFF_HEADER_WRITE, "Error while writing parameter file %s", aName.c_str());
  }
  return aName;
}

// ------------------------------------------------------------ the conversion

void traceInput(const STiffRequest &theRequest, const CRasterFile &theRaster, const CDescription &theHeader) {
  fdfTraceMessage("\nMAKE TIFF OF FILE [%s]\n", theRequest.mInput.c_str());
  fdfTraceMessage("TIFF  NAME  [%s%s]\n", "", theRequest.mTiff.c_str());
  fdfTraceMessage("Data Units : %s", fdfDataUnitsName(theRaster.getDataUnits()));
  fdfTraceMessage(";  Data Type : %s", fdfCellTypeName(theRaster.getCellType()));
  fdfTraceMessage(";  Number of Line : %d", theRaster.getNrOfLinesPerImage());
  fdfTraceMessage(";  Number of Pixels : %d\n", theRaster.getNrOfPixelsPerLine());
  fdfTraceMessage("%s\n", switchIsOn(theHeader, "RasterInfo.TiffRowsInvert") ? "Rows invert" : "Rows Normal");
  fdfTraceMessage("%s\n", switchIsOn(theHeader, "RasterInfo.TiffColsInvert") ? "Cols invert" : "Cols Normal");
}

// Reductions beyond the image would leave no pixel: they take the whole side.
STLRXTiffGrid makeGrid(const STiffRequest &theRequest, const CRasterFile &theRaster, const CDescription &theHeader) {
  STLRXTiffGrid aGrid;
  const int32_t aRows = theRaster.getNrOfLinesPerImage();
  const int32_t aCols = theRaster.getNrOfPixelsPerLine();
  aGrid.mRowFactor = std::min(theRequest.mRowFactor, aRows);
  aGrid.mColFactor = std::min(theRequest.mColFactor, aCols);
  aGrid.mOutRows = aRows / aGrid.mRowFactor;
  aGrid.mOutCols = aCols / aGrid.mColFactor;
  aGrid.mInvertRows = theRequest.mInvertRows || switchIsOn(theHeader, "RasterInfo.TiffRowsInvert");
  aGrid.mInvertCols = theRequest.mInvertCols || switchIsOn(theHeader, "RasterInfo.TiffColsInvert");
  fdfTraceMessage("TIFF SIZE Row = %d  X  Col = %d\n", aGrid.mOutRows, aGrid.mOutCols);
  return aGrid;
}

void traceStretch(const STLRXStretch &theStretch, ETLRXTiffFamily theFamily, const STiffRequest &theRequest,
                  const CTiffSample &theSample) {
  fdfTraceMessage("Stretch of %s data : origin %.9g  scale %.9g  exponent %.9g  top %.9g\n",
                  fdfTiffFamilyName(theFamily), theStretch.mOrigin, theStretch.mScale, theStretch.mExponent,
                  theStretch.maxValue());
  if (theFamily == ETLRXTiffFamily::kIntensity && !theSample.hasNegative())
    fdfTraceMessage("\n\nAverage input value: %g\n", theStretch.mMean * theStretch.mMean);
  if (theFamily == ETLRXTiffFamily::kInterferogram) {
    // The magnitude of a normalised interferogram is coherence-like: an
    // amplitude stretch of 2.5 L g / m^e would saturate it, so the phase is shown.
    const double aMean = std::fabs(theSample.mean()) > CTLRX_TIFF_TINY ? theSample.mean() : CTLRX_TIFF_MEAN_STAND_IN;
    fdfTraceMessage("Amplitude scale (phase shown instead) : %g\n",
                    2.5 * theStretch.mLevels * theRequest.mGain / std::pow(std::fabs(aMean), theRequest.mExponent));
  }
}

void reportSummary(const STiffRequest &theRequest, const CTiffSample &theSample, const STLRXStretch &theStretch) {
  const double aMin = theRequest.mForcedMin != nullptr ? *theRequest.mForcedMin : theSample.minimum();
  const double aMax = theRequest.mForcedMax != nullptr ? *theRequest.mForcedMax : theSample.maximum();
  const std::string aStars(80, '*');
  fdfTraceMessage("\n%s\nMin all images = %g\nMax all images = %g\nALL IMAGE Null Value: %d\n%s\n", aStars.c_str(),
                  aMin, aMax, static_cast<int>(CTLRX_TIFF_NULL_LEVEL), aStars.c_str());
  // An information line in the log: a counted warning would end every run
  // that makes a quick-look with the warning status.
  fdfLogMessage(";  Min : %lf  ;  Mean : %lf  ;  Max : %lf    ;   TIFF  Saturation : %lf  ;  Scale : %lf"
                "  ;  Exponent    : %lf\n",
                aMin, theSample.mean(), aMax, theRequest.mSaturation, theStretch.mScale, theStretch.mExponent);
}

int32_t convert(const STiffRequest &theRequest) {
  CDescription aHeader;
  loadInputHeader(theRequest.mInput, aHeader);
  CRasterFile aRaster;
  openInputRaster(theRequest.mInput, aHeader, aRaster);
  traceInput(theRequest, aRaster, aHeader);
  const STLRXTiffGrid aGrid = makeGrid(theRequest, aRaster, aHeader);
  const ETLRXTiffFamily aFamily = fdfTiffFamily(aRaster.getDataUnits());
  CTiffLineSource aSource(aRaster, aFamily);
  CProgress aProgress;

  const SSampleWindow aWindow =
      sampleWindow(theRequest, aRaster.getNrOfLinesPerImage(), aRaster.getNrOfPixelsPerLine());
  const CTiffSample aSample = takeSample(aSource, aWindow, aProgress, theRequest.mInput);
  STLRXStretchRequest aStretchRequest{aFamily,           theRequest.mSaturation, theRequest.mGain,
                                      theRequest.mExponent, theRequest.mLevels,     theRequest.mForcedMin,
                                      theRequest.mForcedMax};
  STLRXStretch aStretch = fdfMakeStretch(aStretchRequest, aSample);
  std::unique_ptr<CTiffHistogramLut> aLut;
  if (theRequest.mHistogram && aStretch.mShape == ETLRXStretchShape::kClip) {
    aLut = buildHistogram(theRequest, aSample, aSource, aWindow, aProgress);
    aStretch = fdfHistogramStretch(*aLut);
  }
  traceStretch(aStretch, aFamily, theRequest, aSample);

  CGeoTiffFile aTiff(theRequest.mTiff, static_cast<uint64_t>(aGrid.mOutRows) * static_cast<uint64_t>(aGrid.mOutCols));
  const char *aBanner = fdfGetBanner();
  aTiff.writeFields({static_cast<uint32_t>(aGrid.mOutCols), static_cast<uint32_t>(aGrid.mOutRows),
                     aBanner != nullptr && aBanner[0] != '\0' ? aBanner : "Tellurix", theRequest.mInput});
  writePhotometric(aTiff, aFamily, aHeader);
  aTiff.writeGeoReference(fdfGeoReferenceFromHeader(aHeader, aGrid));
  writeRows(aTiff, aSource, aGrid, aStretch, fdfTiffBlockRule(aFamily), aProgress);
  aTiff.finish();
  aRaster.close();

  storeTiffKeys(aHeader, aStretch, aGrid, aLut.get());
  const std::string aHeaderName = writeTiffHeader(aHeader, theRequest.mTiff);
  // Both belong to the run: a run that fails later removes them with its
  // other results.
  fdfAddPendingFile(aHeaderName);
  try {
    aTiff.commit();
  } catch (...) {
    std::remove(aHeaderName.c_str()); // no header for a TIFF that is not there
    throw;
  }
  fdfAddPendingFile(theRequest.mTiff);
  reportSummary(theRequest, aSample, aStretch);
  return 0;
}

// ------------------------------------------------------------ argument vector

bool argumentGiven(int theArgc, char **theArgv, int thePosition) {
  return thePosition < theArgc && theArgv[thePosition] != nullptr;
}

// A given number argument is read whole: "2x" is refused, not taken as 2.
int32_t integerArgument(int theArgc, char **theArgv, int thePosition, int32_t theDefault) {
  int32_t aValue = theDefault;
  if (argumentGiven(theArgc, theArgv, thePosition) && !fdfParseWholeInteger(theArgv[thePosition], aValue))
    TLRX_RAISE_F(CTLRX_ERR_TIFF_ARGUMENTS, "geotiff argument %d is not an integer: [%.200s]", thePosition,
                 theArgv[thePosition]);
  return aValue;
}

double decimalArgument(int theArgc, char **theArgv, int thePosition, double theDefault) {
  double aValue = theDefault;
  if (argumentGiven(theArgc, theArgv, thePosition) && !fdfParseWholeDouble(theArgv[thePosition], aValue, true))
    TLRX_RAISE_F(CTLRX_ERR_TIFF_ARGUMENTS, "geotiff argument %d is not a finite number: [%.200s]", thePosition,
                 theArgv[thePosition]);
  return aValue;
}

bool okArgument(int theArgc, char **theArgv, int thePosition) {
  return argumentGiven(theArgc, theArgv, thePosition) && std::strcmp(theArgv[thePosition], "OK") == 0;
}

} // namespace

int32_t tlrx_raster_to_geotiff(const char *theInputName, const char *theTiffName, double theSaturation,
                               int32_t theRowReduction, int32_t theColReduction, double theGain, double theExponent,
                               bool theInvertRows, bool theInvertCols, bool /*theFlag*/, bool theHistogram,
                               int32_t theLevels, int32_t theHistogramSize, const double *theForcedMin,
                               const double *theForcedMax, int32_t theSampleRowStart, int32_t theSampleRowEnd,
                               int32_t theSampleColStart, int32_t theSampleColEnd, bool /*theLastFlag*/) {
  STiffRequest aRequest{theInputName != nullptr ? theInputName : "",
                        theTiffName != nullptr ? theTiffName : "",
                        fdfTiffSaturation(theSaturation),
                        fdfTiffReductionFactor(theRowReduction),
                        fdfTiffReductionFactor(theColReduction),
                        fdfTiffGain(theGain),
                        fdfTiffExponent(theExponent),
                        theInvertRows,
                        theInvertCols,
                        theHistogram,
                        fdfTiffLevels(theLevels),
                        theHistogramSize,
                        theForcedMin,
                        theForcedMax,
                        {theSampleRowStart, theSampleRowEnd, theSampleColStart, theSampleColEnd}};
  return convert(aRequest);
}

int32_t fdfRasterQuickLook(const char *theRasterName, double theSaturation) {
  const std::string aTiff = std::string(theRasterName != nullptr ? theRasterName : "") + ".tif";
  return tlrx_raster_to_geotiff(theRasterName, aTiff.c_str(), theSaturation, 1, 1, 1.0, 1.0, false, false, false,
                                false, CTLRX_TIFF_LEVELS, 1000000, nullptr, nullptr, -1, -1, -1, -1, false);
}

int32_t make_tiff(int theArgc, char **theArgv) {
  fdfTraceMessage("\n  geotiff conversion\n");
  if (!argumentGiven(theArgc, theArgv, CTLRXGC_INPUT_POS) || !argumentGiven(theArgc, theArgv, CTLRXGC_OUTPUT_POS)) {
    fdfTraceMessage("Usage: %s <raster> <tiff> [saturation] [col reduction] [row reduction] [gain] [exponent] [-]"
                    " [invert cols OK] [invert rows OK]\n",
                    argumentGiven(theArgc, theArgv, 0) ? theArgv[0] : "make_tiff");
    TLRX_RAISE_F(CTLRX_ERR_TIFF_ARGUMENTS, "geotiff conversion needs a raster and a TIFF name (%d arguments)",
                 theArgc);
  }
  const double aSaturation = decimalArgument(theArgc, theArgv, CTLRXGC_SAT_DEF_POS, CTLRX_TIFF_DEFAULT_SATURATION);
  const int32_t aColReduction = integerArgument(theArgc, theArgv, CTLRXGC_COLS_REDUCTION_POS, 1);
  const int32_t aRowReduction = integerArgument(theArgc, theArgv, CTLRXGC_ROWS_REDUCTION_POS, 1);
  const double aGain = decimalArgument(theArgc, theArgv, CTLRXGC_SCALE_IN_POS, 1.0);
  const double aExponent = decimalArgument(theArgc, theArgv, CTLRXGC_EXPONENT_POS, 1.0);
  const bool aInvertCols = okArgument(theArgc, theArgv, CTLRXGC_COLS_INVERT_POS);
  const bool aInvertRows = okArgument(theArgc, theArgv, CTLRXGC_ROWS_INVERT_POS);
  fdfTraceMessage("argv[CTLRXGC_SAT_DEF_POS] = %g\nscale_in = %g\naTmpExpo = %g\n", aSaturation, aGain, aExponent);
  fdfTraceMessage("argv[CTLRXGC_COLS_INVERT_POS] = %d\nargv[CTLRXGC_ROWS_INVERT_POS] = %d\n", aInvertCols,
                  aInvertRows);
  return tlrx_raster_to_geotiff(theArgv[CTLRXGC_INPUT_POS], theArgv[CTLRXGC_OUTPUT_POS], aSaturation, aRowReduction,
                                aColReduction, aGain, aExponent, aInvertRows, aInvertCols, false, false,
                                CTLRX_TIFF_LEVELS, 1000000, nullptr, nullptr, -1, -1, -1, -1, false);
}
