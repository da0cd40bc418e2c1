// Map information of geocoded rasters in the form of ENVI headers: the
// "map info" line (reference pixel (1, 1) is the outer corner of the
// upper-left pixel) and, for a named projection, the "projection info" line
// with ENVI's projection code and parameters.
#pragma once

#include <cstdint>
#include <string>

class CDescription;

// UTM zone ("CartographicSystem.Zone", 1 to 60) and hemisphere
// ("CartographicSystem.Hemisphere", "NORTH" in any letter case is north,
// another text south); false like fdfReadMapRegistration.
bool fdfReadUtmZone(const CDescription &theHeader, int32_t &theZone, bool &theNorth, std::string &theKey,
                    std::string &theProblem);

// ENVI projection code of a named cartographic state ("LAMBERT", "MERCATOR",
// ...; compared ignoring case); -1 for a name outside the table. "UTM-GLOBAL"
// and "GEO-GLOBAL" are not named projections and give -1 too.
int32_t fdfEnviProjectionCode(const char *theState);

// Whether theHeader describes a geocoded raster with a map position:
// "RasterInfo.GeocodedImage" equal to "OK" (ignoring case) and both
// "RegistrationCoordinates.LonEasting" and "CartographicSystem.State" set.
bool fdfHasEnviMapPosition(const CDescription &theHeader);

// Appends the map lines of a geocoded raster to theOut: "UTM-GLOBAL",
// "GEO-GLOBAL" or a named projection. The pixel sizes are written without
// sign (ENVI's y size grows southward; headers store north-up spacings as
// negative numbers). A field a line needs that holds no value, a zero
// spacing or a UTM zone outside 1..60 raises 261121 with theEnviFile and the
// field. A state outside the table writes nothing and returns false (traced).
bool fdfAppendEnviMapInfo(const CDescription &theHeader, const char *theEnviFile, std::string &theOut);
