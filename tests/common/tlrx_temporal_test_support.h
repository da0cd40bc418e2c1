// Helpers of the temporal feature tests: parameter files, geocoded test
// rasters and acquisition date texts.
#pragma once

#include "tlrx_description_section.h"
#include "tlrx_standard_header.h"
#include "tlrx_test_support.h"

#include <cstdio>
#include <map>
#include <string>
#include <vector>

// "DD-MMM-YYYY hh:mm:ss.000000" of day theDay after 1 January 2020 (a
// leap year) at theHour o'clock.
inline std::string tlrxAcquisitionText(int theDay, int theHour = 10) {
  static const char *const aMonths[] = {"JAN", "FEB", "MAR", "APR", "MAY", "JUN",
                                        "JUL", "AUG", "SEP", "OCT", "NOV", "DEC"};
  // Civil date from days since 1970-01-01 (Howard Hinnant's algorithm).
  long z = 18262 + theDay + 719468;
  const long aEra = (z >= 0 ? z : z - 146096) / 146097;
  const long aDoe = z - aEra * 146097;
  const long aYoe = (aDoe - aDoe / 1460 + aDoe / 36524 - aDoe / 146096) / 365;
  const long aDoy = aDoe - (365 * aYoe + aYoe / 4 - aYoe / 100);
  const long mp = (5 * aDoy + 2) / 153;
  const long d = aDoy - (153 * mp + 2) / 5 + 1;
  const long m = mp < 10 ? mp + 3 : mp - 9;
  const long y = aYoe + aEra * 400 + (m <= 2 ? 1 : 0);
  char aText[64];
  std::snprintf(aText, sizeof aText, "%02ld-%s-%04ld %02d:00:00.000000", d, aMonths[m - 1], y, theHour);
  return aText;
}

// Marks a written test raster as geocoded with the given registration.
inline void tlrxGeocodeTestRaster(const std::string &theName, double theNorth0, double theEast0, double theNorthStep,
                                  double theEastStep) {
  CDescription aHeader;
  fdfReadStandardHeader(theName.c_str(), aHeader);
  aHeader.getField("RasterInfo.GeocodedImage").setString("OK");
  aHeader.getField("RegistrationCoordinates.LatNorthing").setDouble(theNorth0);
  aHeader.getField("RegistrationCoordinates.LonEasting").setDouble(theEast0);
  aHeader.getField("RegistrationCoordinates.PixelSpacingLatNorth").setDouble(theNorthStep);
  aHeader.getField("RegistrationCoordinates.PixelSpacingLonEast").setDouble(theEastStep);
  aHeader.getField("CartographicSystem.State").setString("UTM-GLOBAL");
  aHeader.getField("CartographicSystem.Zone").setInteger(32);
  aHeader.getField("CartographicSystem.Hemisphere").setString("NORTH");
  fdfWriteStandardHeader(theName.c_str(), aHeader, true);
}

// A parameter file of the temporal command: the inputs, the root, then the
// settings as elements of "MAIN_CMD" in the given order.
struct STLRXTemporalParameters {
  std::vector<std::string> mInputs;
  bool mWithList = true;
  std::string mRoot;
  std::vector<std::pair<std::string, std::string>> mSettings;
  std::string mSaturation = "0"; // written unless mSettings holds one; empty: none
  std::string mEnvironment = "IDL_ENVI_ENV";
  std::string mRootTag = "HEADER_INFO";
};

inline std::string tlrxTemporalParameterText(const STLRXTemporalParameters &theParameters) {
  std::string aText = "<?xml version=\"1.0\" ?>\n<" + theParameters.mRootTag + ">\n   <MAIN_CMD>\n";
  if (theParameters.mWithList) {
    aText += "      <input_file_list>\n         <VectorString NumberOfElements = \"" +
             std::to_string(theParameters.mInputs.size()) + "\">\n";
    for (size_t i = 0; i < theParameters.mInputs.size(); ++i)
      aText += "            <ValueString ID = \"" + std::to_string(i) + "\">" + theParameters.mInputs[i] +
               "</ValueString>\n";
    aText += "         </VectorString>\n      </input_file_list>\n";
  }
  if (!theParameters.mRoot.empty())
    aText += "      <out_root_file_name>" + theParameters.mRoot + "</out_root_file_name>\n";
  bool aSaturation = theParameters.mSaturation.empty();
  for (const auto &aSetting : theParameters.mSettings) {
    aText += "      <" + aSetting.first + ">" + aSetting.second + "</" + aSetting.first + ">\n";
    aSaturation = aSaturation || aSetting.first == "saturation_default";
  }
  if (!aSaturation)
    aText += "      <saturation_default>" + theParameters.mSaturation + "</saturation_default>\n";
  aText += "      <TellurixEnvironment>" + theParameters.mEnvironment + "</TellurixEnvironment>\n";
  return aText + "   </MAIN_CMD>\n</" + theParameters.mRootTag + ">\n";
}
