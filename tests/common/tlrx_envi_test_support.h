// Helpers of the ENVI header tests: standard raster headers filled with a
// layout, a radar geometry or a map position.
#pragma once

#include "tlrx_description_section.h"
#include "tlrx_standard_header.h"

#include <string>

// A raster header of pixels x lines cells of theCellType, nothing before,
// between or after the lines.
inline void tlrxSetRasterLayout(CDescription &theHeader, int32_t thePixels, int32_t theLines,
                                const char *theCellType, const char *theBytesOrder = "LSBF") {
  fdfDeclareStandardHeader(theHeader);
  theHeader.getField("RasterInfo.NrOfPixelsPerLine") = thePixels;
  theHeader.getField("RasterInfo.NrOfLinesPerImage") = theLines;
  theHeader.getField("RasterInfo.CellType") = theCellType;
  theHeader.getField("RasterInfo.HeaderOffset") = 0;
  theHeader.getField("RasterInfo.RowPrefix") = 0;
  theHeader.getField("RasterInfo.RowSuffix") = 0;
  if (theBytesOrder != nullptr)
    theHeader.getField("RasterInfo.BytesOrder") = theBytesOrder;
}

// Map position of a UTM raster (north-up: negative north spacing).
inline void tlrxSetUtm(CDescription &theHeader, double theEasting, double theNorthing, double theSpacing,
                       int32_t theZone, const char *theHemisphere) {
  theHeader.getField("RasterInfo.GeocodedImage") = "OK";
  theHeader.getField("CartographicSystem.State") = "UTM-GLOBAL";
  theHeader.getField("CartographicSystem.Zone") = theZone;
  theHeader.getField("CartographicSystem.Hemisphere") = theHemisphere;
  theHeader.getField("RegistrationCoordinates.LonEasting") = theEasting;
  theHeader.getField("RegistrationCoordinates.LatNorthing") = theNorthing;
  theHeader.getField("RegistrationCoordinates.PixelSpacingLonEast") = theSpacing;
  theHeader.getField("RegistrationCoordinates.PixelSpacingLatNorth") = -theSpacing;
}

// Map position of a geographic raster (north-up: negative latitude spacing).
inline void tlrxSetGeographic(CDescription &theHeader, double theLongitude, double theLatitude,
                              double theLonSpacing, double theLatSpacing) {
  theHeader.getField("RasterInfo.GeocodedImage") = "ok";
  theHeader.getField("CartographicSystem.State") = "GEO-GLOBAL";
  theHeader.getField("RegistrationCoordinates.LonEasting") = theLongitude;
  theHeader.getField("RegistrationCoordinates.LatNorthing") = theLatitude;
  theHeader.getField("RegistrationCoordinates.PixelSpacingLonEast") = theLonSpacing;
  theHeader.getField("RegistrationCoordinates.PixelSpacingLatNorth") = -theLatSpacing;
}
