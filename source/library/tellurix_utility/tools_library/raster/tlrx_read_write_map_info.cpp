// Map information of geocoded rasters as ENVI header lines.
//
// ENVI (and GDAL reading it) places map info's reference pixel (1, 1) at the
// outer corner of the upper-left pixel, which is what "LonEasting" and
// "LatNorthing" give, and takes both pixel sizes as positive numbers with y
// growing southward. Projection info lines share one parameter order,
// {code, a, b, lat0, lon0, false easting, false northing, [extra], datum,
// name, units}, the order in which ENVI and GDAL read codes 3, 4, 7, 9, 31.
#include "tlrx_read_write_map_info.h"

#include "tlrx_description_section.h"
#include "tlrx_envi_util.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_header_numbers.h"

#include <strings.h>

#include <cmath>

namespace {

// Parameters after the false northing.
enum class EProjectionExtra { None, ScaleFactor, StandardParallels };

struct SProjection {
  const char *mState;
  int32_t mCode;
  EProjectionExtra mExtra;
};

// The codes of LAMBERT, LAMBERT72, GNOMONIC, MILLER, MERCATOR,
// POLAR_STEREOGRAPHIC and ALBERS are ENVI's; Belgian Lambert 2008 is a
// conformal conic too; stereographic states take 7, transverse Mercator
// variants 3.
const SProjection CTLRX_PROJECTIONS[] = {
    {"LAMBERT", 4, EProjectionExtra::StandardParallels},
    {"LAMBERT72", 4, EProjectionExtra::StandardParallels},
    {"LAMBERT2008", 4, EProjectionExtra::StandardParallels},
    {"ALBERS", 9, EProjectionExtra::StandardParallels},
    {"GNOMONIC", 13, EProjectionExtra::None},
    {"MILLER", 18, EProjectionExtra::None},
    {"MERCATOR", 20, EProjectionExtra::None},
    {"POLAR_STEREOGRAPHIC", 31, EProjectionExtra::None},
    {"STEREOGRAPHIC", 7, EProjectionExtra::ScaleFactor},
    {"OBLIQUE_STEREOGRAPHIC", 7, EProjectionExtra::ScaleFactor},
    {"TRANSVERSE_MERCATOR", 3, EProjectionExtra::ScaleFactor},
    {"GAUSS_KRUGER", 3, EProjectionExtra::ScaleFactor},
    {"GAUSS_BOAGA", 3, EProjectionExtra::ScaleFactor},
};

struct SDatum {
  const char *mName;
  double mSemiMajor;
  double mSemiMinor;
};
const SDatum CTLRX_WGS84 = {"WGS-84", 6378137.0, 6356752.314245179};
// Belgian Datum 1972 on the International 1924 ellipsoid.
const SDatum CTLRX_BD72 = {"BD72", 6378388.0, 6356911.946127946};

const SProjection *findProjection(const char *theState) {
  if (theState == nullptr)
    return nullptr;
  for (const SProjection &aProjection : CTLRX_PROJECTIONS) {
    if (strcasecmp(aProjection.mState, theState) == 0)
      return &aProjection;
  }
  return nullptr;
}

// The fields the map lines read; a missing or unusable one raises 261121
// naming the ENVI file and the key.
class CMapFields {
public:
  CMapFields(const CDescription &theHeader, const char *theEnviFile)
      : mHeader(theHeader), mEnviFile(theEnviFile), mReader{CTLRX_ERR_FILE_PARSE, theEnviFile} {}

  double number(const char *theKey) const { return fdfHeaderFiniteReal(mHeader, theKey, mReader); }
  double numberOr(const char *theKey, double theDefault) const {
    return fdfHeaderHolds(mHeader, theKey) ? number(theKey) : theDefault;
  }
  SMapRegistration registration() const {
    SMapRegistration aRegistration;
    std::string aKey, aProblem;
    if (!fdfReadMapRegistration(mHeader, aRegistration, aKey, aProblem))
      fail(aKey.c_str(), aProblem.c_str());
    return aRegistration;
  }
  const char *text(const char *theKey) const { return fdfEnviFieldText(mHeader, theKey); }
  [[noreturn]] void fail(const char *theKey, const char *theWhat) const {
    TLRX_RAISE_F(CTLRX_ERR_FILE_PARSE, "%s: %s %s", mEnviFile, theKey, theWhat);
  }

private:
  const CDescription &mHeader;
  const char *mEnviFile;
  SHeaderReader mReader;
};

// Upper-left corner and pixel sizes: ", E, N, sx, sy".
std::string cornerAndSpacings(const CMapFields &theFields) {
  const SMapRegistration aRegistration = theFields.registration();
  std::string aText;
  aText.append(", ").append(fdfEnviDouble(aRegistration.mEasting));
  aText.append(", ").append(fdfEnviDouble(aRegistration.mNorthing));
  aText.append(", ").append(fdfEnviDouble(std::fabs(aRegistration.mEastSpacing)));
  aText.append(", ").append(fdfEnviDouble(std::fabs(aRegistration.mNorthSpacing)));
  return aText;
}

void appendUtm(const CMapFields &theFields, const CDescription &theHeader, std::string &theOut) {
  int32_t aZone = 0;
  bool aNorth = false;
  std::string aKey, aProblem;
  if (!fdfReadUtmZone(theHeader, aZone, aNorth, aKey, aProblem))
    theFields.fail(aKey.c_str(), aProblem.c_str());
  theOut.append("map info = {UTM, 1, 1").append(cornerAndSpacings(theFields));
  theOut.append(",\n ").append(std::to_string(aZone));
  theOut.append(aNorth ? ", North" : ", South").append(", WGS-84, units=Meters }\n");
}

void appendGeographic(const CMapFields &theFields, std::string &theOut) {
  theOut.append("map info = {Geographic Lat/Lon, 1, 1").append(cornerAndSpacings(theFields));
  theOut.append(", WGS-84, \n units=Degrees}\n");
}

void appendNamedProjection(const CMapFields &theFields, const char *theState, const SProjection &theProjection,
                           std::string &theOut) {
  const SDatum &aDatum = strcasecmp(theState, "LAMBERT72") == 0 ? CTLRX_BD72 : CTLRX_WGS84;
  const char *aUnitsText = theFields.text("CartographicSystem.Units");
  const char *aUnits = aUnitsText != nullptr && strcasecmp(aUnitsText, "Degrees") == 0 ? "Degrees" : "Meters";

  theOut.append("map info = {").append(theState).append(", 1.0, 1.0").append(cornerAndSpacings(theFields));
  theOut.append(", ").append(aDatum.mName).append(", units=").append(aUnits).append("}\n");

  const char *const aCommonKeys[] = {"CartographicSystem.OriginLatitude", "CartographicSystem.CentralMeridian",
                                     "CartographicSystem.FalseEasting", "CartographicSystem.FalseNorthing"};
  theOut.append("projection info = {").append(std::to_string(theProjection.mCode));
  theOut.append(", ").append(fdfEnviDouble(theFields.numberOr("CartographicSystem.SemiMajorAxis", aDatum.mSemiMajor)));
  theOut.append(", ").append(fdfEnviDouble(theFields.numberOr("CartographicSystem.SemiMinorAxis", aDatum.mSemiMinor)));
  for (const char *aKey : aCommonKeys)
    theOut.append(", ").append(fdfEnviDouble(theFields.number(aKey)));
  if (theProjection.mExtra == EProjectionExtra::ScaleFactor) {
    theOut.append(", ").append(fdfEnviDouble(theFields.number("CartographicSystem.ProjectionScaleFactor")));
  } else if (theProjection.mExtra == EProjectionExtra::StandardParallels) {
    theOut.append(", ").append(fdfEnviDouble(theFields.number("CartographicSystem.StandardParallel1")));
    theOut.append(", ").append(fdfEnviDouble(theFields.number("CartographicSystem.StandardParallel2")));
  }
  theOut.append(", ").append(aDatum.mName).append(", ").append(theState);
  theOut.append(", units=").append(aUnits).append("}\n");
}

} // namespace

int32_t fdfEnviProjectionCode(const char *theState) {
  const SProjection *aProjection = findProjection(theState);
  return aProjection != nullptr ? aProjection->mCode : -1;
}

bool fdfHasEnviMapPosition(const CDescription &theHeader) {
  const char *aGeocoded = fdfEnviFieldText(theHeader, "RasterInfo.GeocodedImage");
  double aEasting = 0.0;
  return aGeocoded != nullptr && strcasecmp(aGeocoded, "OK") == 0 &&
         fdfEnviFieldNumber(theHeader, "RegistrationCoordinates.LonEasting", aEasting) &&
         fdfEnviFieldText(theHeader, "CartographicSystem.State") != nullptr;
}

bool fdfAppendEnviMapInfo(const CDescription &theHeader, const char *theEnviFile, std::string &theOut) {
  const CMapFields aFields(theHeader, theEnviFile);
  const char *aState = aFields.text("CartographicSystem.State");
  if (aState == nullptr)
    aFields.fail("CartographicSystem.State", "holds no value");
  if (strcasecmp(aState, "UTM-GLOBAL") == 0) {
    appendUtm(aFields, theHeader, theOut);
    return true;
  }
  if (strcasecmp(aState, "GEO-GLOBAL") == 0) {
    appendGeographic(aFields, theOut);
    return true;
  }
  const SProjection *aProjection = findProjection(aState);
  if (aProjection == nullptr) {
    fdfTraceMessage("ENVI map info not written for %s: unknown cartographic state %s\n", theEnviFile, aState);
    return false;
  }
  appendNamedProjection(aFields, aState, *aProjection, theOut);
  return true;
}
