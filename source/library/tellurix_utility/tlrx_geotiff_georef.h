// Georeferencing of GeoTIFF quick-looks: the GeoTIFF keys, tie point and
// pixel scale derived from the cartographic fields of a raster header.
//
// The header gives the outer corner of the upper-left pixel ("LonEasting",
// "LatNorthing") and the pixel spacings of a north-up raster, whose
// magnitudes are used. The quick-look is pixel-is-area, so its tie point is
// the outer corner of its own upper-left pixel: with reduction factors
// (rr, cr) it covers the first R' x rr rows and C' x cr columns of the
// raster, and a mirrored quick-look starts at the far edge of that area and
// steps backwards (a negative pixel scale).
#pragma once

#include <cstdint>
#include <string>
#include <vector>

class CDescription;

// GeoTIFF key numbers used here.
constexpr int CTLRX_GT_MODEL_TYPE = 1024;
constexpr int CTLRX_GT_RASTER_TYPE = 1025;
constexpr int CTLRX_GT_CITATION = 1026;
constexpr int CTLRX_GEOGRAPHIC_TYPE = 2048;
constexpr int CTLRX_GEOG_CITATION = 2049;
constexpr int CTLRX_GEOG_GEODETIC_DATUM = 2050;
constexpr int CTLRX_GEOG_PRIME_MERIDIAN = 2051;
constexpr int CTLRX_GEOG_ANGULAR_UNITS = 2054;
constexpr int CTLRX_GEOG_ANGULAR_UNIT_SIZE = 2055;
constexpr int CTLRX_GEOG_ELLIPSOID = 2056;
constexpr int CTLRX_PROJECTED_CS_TYPE = 3072;
constexpr int CTLRX_PCS_CITATION = 3073;
constexpr int CTLRX_PROJ_LINEAR_UNITS = 3076;
constexpr int CTLRX_PROJ_LINEAR_UNIT_SIZE = 3077;

enum class ETLRXGeoKeyType { kShort, kDouble, kText };

struct STLRXGeoKey {
  int mKey;
  ETLRXGeoKeyType mType;
  int mShort;
  double mDouble;
  std::string mText;
};

// How the quick-look's pixels relate to the raster's.
struct STLRXTiffGrid {
  int32_t mOutRows = 0;
  int32_t mOutCols = 0;
  int32_t mRowFactor = 1;
  int32_t mColFactor = 1;
  bool mInvertRows = false;
  bool mInvertCols = false;
};

struct STLRXGeoReference {
  std::vector<STLRXGeoKey> mKeys;
  bool mHasTransform = false;
  double mTiePoint[6] = {0, 0, 0, 0, 0, 0}; // raster (0, 0, 0) -> model (x, y, 0)
  double mPixelScale[3] = {0, 0, 0};        // x step, y step (downwards positive), 0

  const STLRXGeoKey *findKey(int theKey) const;
};

// Keys by "CartographicSystem.State": none ("No Geocoded Image" only),
// "GEO-GLOBAL" (WGS 84 geographic, EPSG 4326), "UTM-GLOBAL" (EPSG 326zz or
// 327zz from "Zone" and "Hemisphere"), anything else (projected, metres, the
// fields in the citation). The transform comes from "RegistrationCoordinates"
// when the state is given and the corner and both spacings are usable.
STLRXGeoReference fdfGeoReferenceFromHeader(const CDescription &theHeader, const STLRXTiffGrid &theGrid);
