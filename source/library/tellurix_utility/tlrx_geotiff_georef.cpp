// Georeferencing of GeoTIFF quick-looks from the cartographic header fields.
#include "tlrx_geotiff_georef.h"

#include "tlrx_description_section.h"
#include "tlrx_enviroment.h"
#include "tlrx_header_numbers.h"

#include <cmath>
#include <cstdio>
#include <strings.h>

namespace {

constexpr double sRadiansPerDegree = 0.017453292519943295;
constexpr double sMetresPerMetre = 1.0;

const CDescriptionField *scalarField(const CDescription &theHeader, const char *theKey) {
  const CDescriptionField *aField = theHeader.findField(theKey);
  if (aField == nullptr || aField->getShape() != CTLRX_DS_SCALAR || !aField->holdsValue())
    return nullptr;
  return aField;
}

// The field's value as text, whatever its value type; false when absent.
bool fieldText(const CDescription &theHeader, const char *theKey, std::string &theText) {
  const CDescriptionField *aField = scalarField(theHeader, theKey);
  if (aField == nullptr)
    return false;
  char aBuffer[64];
  switch (aField->getValueType()) {
  case CTLRX_DS_STRING: theText = aField->getString(); return true;
  case CTLRX_DS_INTEGER: std::snprintf(aBuffer, sizeof aBuffer, "%d", aField->getInteger()); break;
  case CTLRX_DS_DOUBLE: std::snprintf(aBuffer, sizeof aBuffer, "%.17g", aField->getDouble()); break;
  default: return false;
  }
  theText = aBuffer;
  return true;
}

bool sameText(const std::string &theText, const char *theName) { return strcasecmp(theText.c_str(), theName) == 0; }

STLRXGeoKey shortKey(int theKey, int theValue) { return {theKey, ETLRXGeoKeyType::kShort, theValue, 0.0, ""}; }
STLRXGeoKey doubleKey(int theKey, double theValue) { return {theKey, ETLRXGeoKeyType::kDouble, 0, theValue, ""}; }
STLRXGeoKey textKey(int theKey, const std::string &theText) { return {theKey, ETLRXGeoKeyType::kText, 0, 0.0, theText}; }

// The unit sizes go in as numbers: GeoTIFF readers take 2055 and 3077 as doubles.
std::vector<STLRXGeoKey> geographicKeys() {
  return {shortKey(CTLRX_GT_MODEL_TYPE, 2),
          textKey(CTLRX_GT_CITATION, "Geographic Model WGS 84"),
          shortKey(CTLRX_GEOG_ANGULAR_UNITS, 9102),
          doubleKey(CTLRX_GEOG_ANGULAR_UNIT_SIZE, sRadiansPerDegree),
          shortKey(CTLRX_GT_RASTER_TYPE, 1),
          shortKey(CTLRX_GEOGRAPHIC_TYPE, 4326),
          shortKey(CTLRX_GEOG_GEODETIC_DATUM, 6326),
          shortKey(CTLRX_GEOG_ELLIPSOID, 7030),
          shortKey(CTLRX_GEOG_PRIME_MERIDIAN, 8901),
          textKey(CTLRX_GEOG_CITATION, "WGS 84 Ellipsoid Used")};
}

std::vector<STLRXGeoKey> utmKeys(int theZone, bool theNorth) {
  const char *aLetter = theNorth ? "N" : "S";
  char aCitation[96];
  char aPcsCitation[96];
  std::snprintf(aCitation, sizeof aCitation, "UTM Zone %d%s WGS84", theZone, aLetter);
  std::snprintf(aPcsCitation, sizeof aPcsCitation, "UTM Zone %d%s  with WGS84", theZone, aLetter);
  return {shortKey(CTLRX_GT_MODEL_TYPE, 1),
          textKey(CTLRX_GT_CITATION, aCitation),
          shortKey(CTLRX_GT_RASTER_TYPE, 1),
          shortKey(CTLRX_PROJECTED_CS_TYPE, (theNorth ? 32600 : 32700) + theZone),
          textKey(CTLRX_PCS_CITATION, aPcsCitation),
          shortKey(CTLRX_PROJ_LINEAR_UNITS, 9001),
          doubleKey(CTLRX_PROJ_LINEAR_UNIT_SIZE, sMetresPerMetre)};
}

// The fields present, each after its label; " UNKNOW Data" when none is.
std::string otherCitation(const CDescription &theHeader) {
  static const char *const aLabels[][2] = {
      {"| State =", "CartographicSystem.State"},       {"| Hemisphere =", "CartographicSystem.Hemisphere"},
      {"| Projection =", "CartographicSystem.Projection"}, {"| Zone =", "CartographicSystem.Zone"},
      {"| Ellipsoid =", "CartographicSystem.Ellipsoid"}, {"| DatumShift =", "CartographicSystem.DatumShift"}};
  std::string aCitation;
  for (const auto &aLabel : aLabels) {
    std::string aValue;
    if (fieldText(theHeader, aLabel[1], aValue))
      aCitation += std::string(aLabel[0]) + aValue;
  }
  return aCitation.empty() ? std::string(" UNKNOW Data") : aCitation;
}

std::vector<STLRXGeoKey> otherKeys(const CDescription &theHeader) {
  return {shortKey(CTLRX_GT_MODEL_TYPE, 1), shortKey(CTLRX_GT_RASTER_TYPE, 1),
          shortKey(CTLRX_PROJ_LINEAR_UNITS, 9001), doubleKey(CTLRX_PROJ_LINEAR_UNIT_SIZE, sMetresPerMetre),
          textKey(CTLRX_GT_CITATION, otherCitation(theHeader))};
}

std::vector<STLRXGeoKey> keysOfState(const CDescription &theHeader, const std::string &theState) {
  if (sameText(theState, "GEO-GLOBAL"))
    return geographicKeys();
  if (!sameText(theState, "UTM-GLOBAL"))
    return otherKeys(theHeader);
  int32_t aZone = 0;
  bool aNorth = false;
  std::string aKey, aProblem;
  if (!fdfReadUtmZone(theHeader, aZone, aNorth, aKey, aProblem)) {
    fdfTraceMessage("UTM keys not written: %s %s\n", aKey.c_str(), aProblem.c_str());
    return otherKeys(theHeader);
  }
  return utmKeys(aZone, aNorth);
}

// Tie point and pixel scale of the quick-look; false (traced) when the
// corner or a spacing is missing or unusable.
bool setTransform(const CDescription &theHeader, const STLRXTiffGrid &theGrid, STLRXGeoReference &theGeo) {
  SMapRegistration aRegistration;
  std::string aKey, aProblem;
  if (!fdfReadMapRegistration(theHeader, aRegistration, aKey, aProblem)) {
    fdfTraceMessage("No tie point: %s %s\n", aKey.c_str(), aProblem.c_str());
    return false;
  }
  const double aEasting = aRegistration.mEasting;
  const double aNorthing = aRegistration.mNorthing;
  const double aColSpacing = aRegistration.mEastSpacing;
  const double aRowSpacing = aRegistration.mNorthSpacing;
  const double aStepX = std::fabs(aColSpacing) * theGrid.mColFactor;
  const double aStepY = std::fabs(aRowSpacing) * theGrid.mRowFactor;
  const double aTieX = aEasting + (theGrid.mInvertCols ? aStepX * theGrid.mOutCols : 0.0);
  const double aTieY = aNorthing - (theGrid.mInvertRows ? aStepY * theGrid.mOutRows : 0.0);
  const double aTie[6] = {0.0, 0.0, 0.0, aTieX, aTieY, 0.0};
  const double aScale[3] = {theGrid.mInvertCols ? -aStepX : aStepX, theGrid.mInvertRows ? -aStepY : aStepY, 0.0};
  for (int i = 0; i < 6; ++i)
    theGeo.mTiePoint[i] = aTie[i];
  for (int i = 0; i < 3; ++i)
    theGeo.mPixelScale[i] = aScale[i];
  theGeo.mHasTransform = true;
  return true;
}

} // namespace

const STLRXGeoKey *STLRXGeoReference::findKey(int theKey) const {
  for (const STLRXGeoKey &aKey : mKeys)
    if (aKey.mKey == theKey)
      return &aKey;
  return nullptr;
}

STLRXGeoReference fdfGeoReferenceFromHeader(const CDescription &theHeader, const STLRXTiffGrid &theGrid) {
  STLRXGeoReference aGeo;
  std::string aState;
  if (!fieldText(theHeader, "CartographicSystem.State", aState)) {
    aGeo.mKeys.push_back(textKey(CTLRX_GT_CITATION, "No Geocoded Image"));
    return aGeo;
  }
  aGeo.mKeys = keysOfState(theHeader, aState);
  setTransform(theHeader, theGrid, aGeo);
  return aGeo;
}
