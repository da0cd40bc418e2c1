#include "tlrx_map_grid.h"

#include "tlrx_description_section.h"
#include "tlrx_header_numbers.h"
#include "tlrx_raster_file.h"

#include <algorithm>
#include <cmath>
#include <strings.h>

namespace {

constexpr double CTLRX_GRID_SNAP = 1e-9;

// A count of the header: an integer in 1..CTLRX_RASTER_FILE_MAX_ROWS.
bool fdfReadCount(const CDescription &theHeader, const char *theKey, int32_t &theCount, std::string &theProblem) {
  int32_t aValue = 0;
  if (!fdfReadHeaderInteger(theHeader, theKey, aValue).empty() || aValue < 1 || aValue > CTLRX_RASTER_FILE_MAX_ROWS) {
    theProblem = theKey;
    return false;
  }
  theCount = aValue;
  return true;
}

bool fdfCellCount(double theExtent, double theStep, int32_t &theCount) {
  const double aCells = theExtent / theStep;
  if (!std::isfinite(aCells))
    return false;
  const double aWhole = std::floor(aCells + CTLRX_GRID_SNAP * std::max(1.0, std::fabs(aCells)));
  if (aWhole < 1 || aWhole > CTLRX_RASTER_FILE_MAX_ROWS)
    return false;
  theCount = static_cast<int32_t>(aWhole);
  return true;
}

} // namespace

bool fdfIsGeocodedHeader(const CDescription &theHeader) {
  const CDescriptionField *aField = theHeader.findField("RasterInfo.GeocodedImage");
  return aField != nullptr && aField->holdsValue() && aField->getValueType() == CTLRX_DS_STRING &&
         aField->getShape() == CTLRX_DS_SCALAR && strcasecmp(aField->getString(), "OK") == 0;
}

bool fdfReadRasterSize(const CDescription &theHeader, int32_t &theLines, int32_t &thePixels, std::string &theProblem) {
  return fdfReadCount(theHeader, "RasterInfo.NrOfLinesPerImage", theLines, theProblem) &&
         fdfReadCount(theHeader, "RasterInfo.NrOfPixelsPerLine", thePixels, theProblem);
}

bool fdfReadMapGrid(const CDescription &theHeader, SMapGrid &theGrid, std::string &theProblem) {
  if (!fdfReadRasterSize(theHeader, theGrid.mLines, theGrid.mPixels, theProblem))
    return false;
  SMapRegistration aRegistration;
  std::string aWhy;
  if (!fdfReadMapRegistration(theHeader, aRegistration, theProblem, aWhy))
    return false;
  theGrid.mNorth0 = aRegistration.mNorthing;
  theGrid.mEast0 = aRegistration.mEasting;
  theGrid.mNorthStep = aRegistration.mNorthSpacing;
  theGrid.mEastStep = aRegistration.mEastSpacing;
  // The union and the cell mapping assume north-up rasters.
  if (!(theGrid.mNorthStep < 0.0)) {
    theProblem = "RegistrationCoordinates.PixelSpacingLatNorth";
    return false;
  }
  if (!(theGrid.mEastStep > 0.0)) {
    theProblem = "RegistrationCoordinates.PixelSpacingLonEast";
    return false;
  }
  return true;
}

void fdfStoreMapGrid(CDescription &theHeader, const SMapGrid &theGrid) {
  const struct {
    const char *mKey;
    double mValue;
  } aValues[] = {{"RegistrationCoordinates.PixelSpacingLonEast", theGrid.mEastStep},
                 {"RegistrationCoordinates.PixelSpacingLatNorth", theGrid.mNorthStep},
                 {"RegistrationCoordinates.LonEasting", theGrid.mEast0},
                 {"RegistrationCoordinates.LatNorthing", theGrid.mNorth0}};
  for (const auto &aValue : aValues)
    if (CDescriptionField *aField = theHeader.findField(aValue.mKey))
      aField->setDouble(aValue.mValue);
}

bool fdfUnionMapGrid(const std::vector<SMapGrid> &theGrids, SMapGrid &theUnion) {
  if (theGrids.empty())
    return false;
  double aEastEnd = theGrids[0].mEast0 + theGrids[0].mPixels * theGrids[0].mEastStep;
  double aNorthEnd = theGrids[0].mNorth0 + theGrids[0].mLines * theGrids[0].mNorthStep;
  theUnion = theGrids[0];
  for (const SMapGrid &aGrid : theGrids) {
    theUnion.mEast0 = std::min(theUnion.mEast0, aGrid.mEast0);
    theUnion.mNorth0 = std::max(theUnion.mNorth0, aGrid.mNorth0);
    aEastEnd = std::max(aEastEnd, aGrid.mEast0 + aGrid.mPixels * aGrid.mEastStep);
    aNorthEnd = std::min(aNorthEnd, aGrid.mNorth0 + aGrid.mLines * aGrid.mNorthStep);
    theUnion.mEastStep = std::min(theUnion.mEastStep, aGrid.mEastStep);
    theUnion.mNorthStep = std::max(theUnion.mNorthStep, aGrid.mNorthStep);
  }
  return fdfCellCount(aEastEnd - theUnion.mEast0, theUnion.mEastStep, theUnion.mPixels) &&
         fdfCellCount(aNorthEnd - theUnion.mNorth0, theUnion.mNorthStep, theUnion.mLines);
}

double fdfCellCentrePosition(int32_t theIndex, double theOrigin, double theStep, double theInputOrigin,
                             double theInputStep) {
  const double aPosition = ((theOrigin - theInputOrigin) + (theIndex + 0.5) * theStep) / theInputStep - 0.5;
  const double aNearest = std::nearbyint(aPosition);
  return std::fabs(aPosition - aNearest) < CTLRX_GRID_SNAP * std::max(1.0, std::fabs(aPosition)) ? aNearest
                                                                                                  : aPosition;
}
