// Map grid of a geocoded raster: size, upper-left corner (outer corner of the
// upper-left cell) and cell spacings, as "RasterInfo" and
// "RegistrationCoordinates" of its header give them. Rasters are north-up:
// east spacing positive, north spacing negative.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

class CDescription;

struct SMapGrid {
  int32_t mLines = 0;
  int32_t mPixels = 0;
  double mNorth0 = 0.0;   // "LatNorthing"
  double mEast0 = 0.0;    // "LonEasting"
  double mNorthStep = 0.0; // "PixelSpacingLatNorth", negative
  double mEastStep = 0.0;  // "PixelSpacingLonEast", positive
};

// Whether RasterInfo.GeocodedImage holds "OK" in any letter case.
bool fdfIsGeocodedHeader(const CDescription &theHeader);

// Size of a header, both counts in 1..CTLRX_RASTER_FILE_MAX_ROWS. False (and
// theProblem names the key) when a count is missing or out of range.
bool fdfReadRasterSize(const CDescription &theHeader, int32_t &theLines, int32_t &thePixels, std::string &theProblem);
// Size and registration of a geocoded header; false (theProblem names the
// key) for a missing value, a non-finite one, or a spacing that is not
// north-up (east > 0, north < 0).
bool fdfReadMapGrid(const CDescription &theHeader, SMapGrid &theGrid, std::string &theProblem);
// Stores the registration of theGrid (not its size) into theHeader.
void fdfStoreMapGrid(CDescription &theHeader, const SMapGrid &theGrid);

// The union of the extents at the finest spacings. The cell counts are the
// integer parts of extent / spacing, taken with a relative tolerance of 1e-9
// so that an extent that is a whole number of cells does not lose its last
// cell to rounding. False when a count leaves 1..CTLRX_RASTER_FILE_MAX_ROWS.
bool fdfUnionMapGrid(const std::vector<SMapGrid> &theGrids, SMapGrid &theUnion);

// Position of the centre of cell theIndex of the output axis (origin
// theOrigin, spacing theStep) on the input axis (theInputOrigin,
// theInputStep), in input cell units where cell j's centre lies at j.
// Positions within 1e-9 of a whole number are snapped to it, so that
// aligned grids of equal spacing map cell to cell exactly.
double fdfCellCentrePosition(int32_t theIndex, double theOrigin, double theStep, double theInputOrigin,
                             double theInputStep);
