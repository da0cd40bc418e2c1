#include "tlrx_header_numbers.h"

#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"

#include <climits>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <strings.h>

namespace {

// Texts quoted in messages are cut: a header line can be a megabyte long.
constexpr int CTLRX_HN_QUOTED = 200;

const CDescriptionField *scalarField(const CDescription &theHeader, const char *theKey) {
  const CDescriptionField *aField = theHeader.findField(theKey);
  return aField != nullptr && aField->holdsValue() ? aField : nullptr;
}

std::string quoted(const char *theWhat, const char *theText) {
  char aText[CTLRX_HN_QUOTED + 64];
  std::snprintf(aText, sizeof aText, "%s [%.*s]", theWhat, CTLRX_HN_QUOTED, theText);
  return aText;
}

std::string quoted(const char *theWhat, double theValue) {
  char aText[64];
  std::snprintf(aText, sizeof aText, "%.17g", theValue);
  return quoted(theWhat, aText);
}

// Why the field cannot give a single number; empty when it can.
std::string shapeProblem(const CDescriptionField *theField) {
  if (theField == nullptr)
    return "holds no value";
  if (theField->getShape() != CTLRX_DS_SCALAR)
    return "is not a single value";
  const int32_t aType = theField->getValueType();
  if (aType != CTLRX_DS_INTEGER && aType != CTLRX_DS_DOUBLE && aType != CTLRX_DS_STRING)
    return "is not a number";
  return "";
}

// Headers written by other tools hold "-NaN", "nan(0x...)" and the like.
bool isNaNText(const char *theText) {
  return std::strstr(theText, "NaN") != nullptr || std::strstr(theText, "nan") != nullptr;
}

} // namespace

bool fdfHeaderHolds(const CDescription &theHeader, const char *theKey) {
  const CDescriptionField *aField = scalarField(theHeader, theKey);
  return aField != nullptr && aField->getShape() == CTLRX_DS_SCALAR;
}

std::string fdfHeaderText(const CDescription &theHeader, const char *theKey) {
  const CDescriptionField *aField = theHeader.findField(theKey);
  return aField != nullptr && aField->holdsValue() && aField->getValueType() == CTLRX_DS_STRING ? aField->getString()
                                                                                                : "";
}

std::string fdfReadHeaderInteger(const CDescription &theHeader, const char *theKey, int32_t &theValue) {
  const CDescriptionField *aField = scalarField(theHeader, theKey);
  std::string aProblem = shapeProblem(aField);
  if (!aProblem.empty())
    return aProblem;
  switch (aField->getValueType()) {
  case CTLRX_DS_INTEGER: theValue = aField->getInteger(); return "";
  case CTLRX_DS_DOUBLE: {
    const double aValue = aField->getDouble();
    if (!(aValue >= INT32_MIN && aValue <= INT32_MAX) || aValue != std::floor(aValue))
      return quoted("is not an integer", aValue);
    theValue = static_cast<int32_t>(aValue);
    return "";
  }
  default:
    if (!fdfParseWholeInteger(aField->getString(), theValue))
      return quoted("is not an integer", aField->getString());
    return "";
  }
}

std::string fdfReadHeaderReal(const CDescription &theHeader, const char *theKey, bool theFinite, double &theValue) {
  const CDescriptionField *aField = scalarField(theHeader, theKey);
  std::string aProblem = shapeProblem(aField);
  if (!aProblem.empty())
    return aProblem;
  double aValue = 0.0;
  switch (aField->getValueType()) {
  case CTLRX_DS_INTEGER: aValue = aField->getInteger(); break;
  case CTLRX_DS_DOUBLE: aValue = aField->getDouble(); break;
  default: {
    const char *aText = aField->getString();
    if (isNaNText(aText))
      aValue = std::nan("");
    else if (!fdfParseWholeDouble(aText, aValue, false))
      return quoted("is not a number", aText);
  }
  }
  if (theFinite && !std::isfinite(aValue))
    return quoted("is not a finite number", aValue);
  theValue = aValue;
  return "";
}

void fdfRaiseHeaderProblem(const CDescription &theHeader, const char *theKey, const std::string &theProblem,
                           const SHeaderReader &theReader) {
  if (const CDescriptionField *aField = theHeader.findField(theKey))
    aField->dump();
  const char *aFile = theReader.mFile;
  TLRX_RAISE_F(theReader.mCode, "%.500s%s%.200s %s", aFile != nullptr ? aFile : "", aFile != nullptr ? ": " : "",
               theKey, theProblem.c_str());
}

int32_t fdfHeaderInteger(const CDescription &theHeader, const char *theKey, const SHeaderReader &theReader) {
  int32_t aValue = 0;
  const std::string aProblem = fdfReadHeaderInteger(theHeader, theKey, aValue);
  if (!aProblem.empty())
    fdfRaiseHeaderProblem(theHeader, theKey, aProblem, theReader);
  return aValue;
}

int32_t fdfHeaderIntegerOr(const CDescription &theHeader, const char *theKey, int32_t theDefault,
                           const SHeaderReader &theReader) {
  return scalarField(theHeader, theKey) != nullptr ? fdfHeaderInteger(theHeader, theKey, theReader) : theDefault;
}

int32_t fdfHeaderSize(const CDescription &theHeader, const char *theKey, int32_t theMax,
                      const SHeaderReader &theReader) {
  const int32_t aValue = fdfHeaderInteger(theHeader, theKey, theReader);
  if (aValue < 1 || aValue > theMax) {
    char aWhat[64];
    std::snprintf(aWhat, sizeof aWhat, "is not in 1 to %d", theMax);
    fdfRaiseHeaderProblem(theHeader, theKey, quoted(aWhat, aValue), theReader);
  }
  return aValue;
}

namespace {

double realOrRaise(const CDescription &theHeader, const char *theKey, bool theFinite, const SHeaderReader &theReader) {
  double aValue = 0.0;
  const std::string aProblem = fdfReadHeaderReal(theHeader, theKey, theFinite, aValue);
  if (!aProblem.empty())
    fdfRaiseHeaderProblem(theHeader, theKey, aProblem, theReader);
  return aValue;
}

} // namespace

double fdfHeaderReal(const CDescription &theHeader, const char *theKey, const SHeaderReader &theReader) {
  return realOrRaise(theHeader, theKey, false, theReader);
}

double fdfHeaderRealOr(const CDescription &theHeader, const char *theKey, double theDefault,
                       const SHeaderReader &theReader) {
  return scalarField(theHeader, theKey) != nullptr ? fdfHeaderReal(theHeader, theKey, theReader) : theDefault;
}

double fdfHeaderFiniteReal(const CDescription &theHeader, const char *theKey, const SHeaderReader &theReader) {
  return realOrRaise(theHeader, theKey, true, theReader);
}

double fdfHeaderNullValue(const CDescription &theHeader, const SHeaderReader &theReader) {
  return fdfHeaderRealOr(theHeader, "RasterInfo.NullCellValue", 0.0, theReader);
}

bool fdfReadMapRegistration(const CDescription &theHeader, SMapRegistration &theRegistration, std::string &theKey,
                            std::string &theProblem) {
  const struct {
    const char *mKey;
    double *mValue;
    bool mSpacing;
  } aFields[] = {{"RegistrationCoordinates.LonEasting", &theRegistration.mEasting, false},
                 {"RegistrationCoordinates.LatNorthing", &theRegistration.mNorthing, false},
                 {"RegistrationCoordinates.PixelSpacingLonEast", &theRegistration.mEastSpacing, true},
                 {"RegistrationCoordinates.PixelSpacingLatNorth", &theRegistration.mNorthSpacing, true}};
  for (const auto &aField : aFields) {
    theKey = aField.mKey;
    theProblem = fdfReadHeaderReal(theHeader, aField.mKey, true, *aField.mValue);
    if (theProblem.empty() && aField.mSpacing && *aField.mValue == 0.0)
      theProblem = "is not a usable pixel spacing";
    if (!theProblem.empty())
      return false;
  }
  return true;
}

bool fdfReadUtmZone(const CDescription &theHeader, int32_t &theZone, bool &theNorth, std::string &theKey,
                    std::string &theProblem) {
  theKey = "CartographicSystem.Zone";
  theProblem = fdfReadHeaderInteger(theHeader, theKey.c_str(), theZone);
  if (theProblem.empty() && (theZone < 1 || theZone > 60))
    theProblem = "is not a UTM zone (1 to 60)";
  if (!theProblem.empty())
    return false;
  const CDescriptionField *aHemisphere = scalarField(theHeader, "CartographicSystem.Hemisphere");
  if (aHemisphere == nullptr || aHemisphere->getShape() != CTLRX_DS_SCALAR ||
      aHemisphere->getValueType() != CTLRX_DS_STRING) {
    theKey = "CartographicSystem.Hemisphere";
    theProblem = "holds no value";
    return false;
  }
  theNorth = strcasecmp(aHemisphere->getString(), "NORTH") == 0;
  return true;
}
