// Standard header description of raster headers: its sections, and reading
// and writing a raster's header through it.
#include "tlrx_standard_header.h"

#include <strings.h>

#include <cstring>

#include "tlrx_enviroment.h"
#include "tlrx_errors.h"

namespace {

bool endsWithNoCase(const std::string &theText, const char *theSuffix) {
  const size_t aLen = std::strlen(theSuffix);
  return theText.size() >= aLen && strcasecmp(theText.c_str() + theText.size() - aLen, theSuffix) == 0;
}

// The header of raster theName: the name itself when it already names a header.
std::string standardHeaderName(const char *theName) {
  const std::string aName = theName != nullptr ? theName : "";
  for (const char *aSuffix : {"_orb_hdr", "_hdr", "_orb.sml"}) {
    if (endsWithNoCase(aName, aSuffix)) {
      return aName;
    }
  }
  return aName + "_hdr";
}

} // namespace

const std::vector<std::string> &fdfStandardHeaderSections() {
  static const std::vector<std::string> aSections = {
      "EnvisatDescriptionRecord",
      "EnvisatFixHeader",
      "user_defined_section",
      "CartographicSystem",
      "RegistrationCoordinates",
      "DEMCoordinates",
      "AcquisitionParameters",
      "ChannelInfo",
      "Sensor",
      "orbit_information",
      "sar_processing",
      "interferometric_processing",
      "PolarimetricCalibrationParameters",
      "RasterInfo",
      "Processing",
      "InitialGeometry",
      "StateVectorData",
      "StateVectorCalc",
      "OrbitCorrection",
      "Baseline",
      "GCPRasterInfo",
  };
  return aSections;
}

void fdfDeclareStandardHeader(CDescription &theDescription) {
  theDescription.initialise(fdfStandardHeaderSections());
  theDescription.setRootTag(CTLRX_DS_DEFAULT_ROOT_TAG);
}

void fdfReadStandardHeader(const char *theName, CDescription &theDescription) {
  fdfDeclareStandardHeader(theDescription);
  const std::string aHeader = standardHeaderName(theName);
  if (!fdfExistDescriptionFileOrSml(aHeader.c_str())) {
    fdfTraceMessage("Not found parameter file %s\n", aHeader.c_str());
  }
  if (!theDescription.readFromFile(aHeader.c_str(), false)) {
    fdfTraceMessage("Error: missing parameter file %s\n", aHeader.c_str());
    // The code says "cannot be opened"; the message says what happened.
    const std::string &aReason = theDescription.getReadError();
    TLRX_RAISE(CTLRX_ERR_FILE_OPEN, aReason.empty() ? aHeader.c_str() : aReason.c_str());
  }
}

bool fdfWriteStandardHeader(const char *theName, CDescription &theDescription, bool theRaise) {
  const char *aName = theName != nullptr ? theName : "";
  const bool aWritten = theDescription.writeToFile(aName, false, false);
  if (!aWritten && theRaise) {
    fdfTraceMessage("Error while writing parameter file %s\n", aName);
    TLRX_RAISE(CTLRX_ERR_FILE_WRITE, aName);
  }
  return aWritten;
}
