#include "tlrx_temporal_grid.h"

#include "tlrx_description_section.h"
#include "tlrx_description_xml.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_step_common.h"
#include "tlrx_generic_utility.h"
#include "tlrx_map_grid.h"
#include "tlrx_raster_file.h"
#include "tlrx_standard_header.h"

namespace {

// Result fields that describe the first input's values rather than the
// results: left without a value.
const char *const sClearedFields[] = {"RasterInfo.CalibrationValue", "RasterInfo.CalibrationType",
                                        "RasterInfo.RescalingMinValue", "RasterInfo.RescalingScaleValue"};

// The results are plain float records; a copied offset, row prefix or scale
// factor would make a reader misplace or rescale every value.
const struct {
  const char *mKey;
  double mValue;
} sLayoutFields[] = {{"RasterInfo.HeaderOffset", 0},   {"RasterInfo.RowPrefix", 0},
                       {"RasterInfo.RowSuffix", 0},      {"RasterInfo.FooterLen", 0},
                       {"RasterInfo.NrOfChannels", 1},   {"RasterInfo.RealScaleFactor", 1.0},
                       {"RasterInfo.ImaginaryScaleFactor", 1.0}};

[[noreturn]] void fdfRaiseUnreadable(const std::string &theName, const std::string &theProblem) {
  const std::string aHeader = fdfHeaderFileName(theName);
  fdfTraceMessage("Error while reading parameter file %s  (%s)\n", aHeader.c_str(), theProblem.c_str());
  TLRX_RAISE(CTLRX_ERR_FILE_WRITE, aHeader.c_str());
}

void fdfMakeGridHeader(CDescription &theHeader, int32_t theLines, int32_t thePixels) {
  fdfSetHeaderNumber(theHeader, "RasterInfo.NrOfPixelsPerLine", thePixels);
  fdfSetHeaderNumber(theHeader, "RasterInfo.NrOfLinesPerImage", theLines);
  fdfSetHeaderText(theHeader, "RasterInfo.DataUnits", "NUMBER");
  fdfSetHeaderText(theHeader, "RasterInfo.CellType", "FLOAT");
  for (const char *aKey : sClearedFields)
    if (CDescriptionField *aField = theHeader.findField(aKey))
      aField->clear();
  for (const auto &aField : sLayoutFields)
    fdfSetHeaderNumber(theHeader, aField.mKey, aField.mValue);
}

} // namespace

void fdfReadTemporalInputHeader(const std::string &theName, CDescription &theHeader) {
  fdfDeclareStandardHeader(theHeader);
  const std::string aHeader = fdfHeaderFileName(theName);
  // A missing input is reported as missing, not as a header that failed.
  if (!fdfExistFile(fdfXmlHeaderFileName(aHeader).c_str()) && !fdfExistFile(aHeader.c_str())) {
    fdfTraceMessage("Error: missing parameter file %s\n", aHeader.c_str());
    TLRX_RAISE(CTLRX_ERR_FILE_OPEN, aHeader.c_str());
  }
  if (!theHeader.readFromFile(aHeader.c_str(), false)) {
    fdfTraceMessage("Error while reading parameter file %s\n", aHeader.c_str());
    TLRX_RAISE(CTLRX_ERR_FILE_WRITE, aHeader.c_str());
  }
}

STemporalGridInfo fdfBuildTemporalGrid(const std::vector<std::string> &theInputs, const std::string &theGrid) {
  STemporalGridInfo aInfo;
  CDescription aGridHeader;
  std::vector<SMapGrid> aGrids;
  int32_t aLines = 0, aPixels = 0;
  for (size_t i = 0; i < theInputs.size(); ++i) {
    CDescription aOther;
    CDescription &aHeader = i == 0 ? aGridHeader : aOther;
    fdfReadTemporalInputHeader(theInputs[i], aHeader);
    const bool aGeocoded = fdfIsGeocodedHeader(aHeader);
    if (i == 0) {
      aInfo.mGeocoded = aGeocoded;
    } else if (aGeocoded != aInfo.mGeocoded) {
      const std::string aName = fdfHeaderFileName(theInputs[i]);
      fdfTraceMessage("All the images has to be geocoded or not %s\n", aName.c_str());
      TLRX_RAISE(CTLRX_ERR_FILE_WRITE, aName.c_str());
    }
    SMapGrid aGrid;
    std::string aProblem;
    if (aGeocoded ? !fdfReadMapGrid(aHeader, aGrid, aProblem)
                  : !fdfReadRasterSize(aHeader, aGrid.mLines, aGrid.mPixels, aProblem))
      fdfRaiseUnreadable(theInputs[i], aProblem);
    aLines = i == 0 ? aGrid.mLines : std::min(aLines, aGrid.mLines);
    aPixels = i == 0 ? aGrid.mPixels : std::min(aPixels, aGrid.mPixels);
    aInfo.mLargestPixels = std::max(aInfo.mLargestPixels, aGrid.mPixels);
    aGrids.push_back(aGrid);
  }
  if (aInfo.mGeocoded) {
    SMapGrid aUnion;
    if (!fdfUnionMapGrid(aGrids, aUnion)) {
      const std::string aName = fdfHeaderFileName(theGrid);
      fdfTraceMessage("Error: the union of the input extents is not a usable grid %s\n", aName.c_str());
      TLRX_RAISE(CTLRX_ERR_FILE_PARSE, aName.c_str());
    }
    aLines = aUnion.mLines;
    aPixels = aUnion.mPixels;
    fdfStoreMapGrid(aGridHeader, aUnion);
    fdfTraceMessage("Output grid: %d x %d  E0 = %.6f  N0 = %.6f  dE = %.6f  dN = %.6f\n", aLines, aPixels,
                    aUnion.mEast0, aUnion.mNorth0, aUnion.mEastStep, aUnion.mNorthStep);
  }
  fdfMakeGridHeader(aGridHeader, aLines, aPixels);
  if (!fdfWriteStandardHeader(theGrid.c_str(), aGridHeader, false)) {
    const std::string aName = fdfHeaderFileName(theGrid);
    fdfTraceMessage("Error: missing parameter file %s\n", aName.c_str());
    TLRX_RAISE(CTLRX_ERR_FILE_OPEN, aName.c_str());
  }
  return aInfo;
}
