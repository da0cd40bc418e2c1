// GeoTIFF quick-looks read by outside tools: gdalinfo -json (data type,
// size after reduction, EPSG code, geotransform, colour table), listgeo
// (GeoTIFF keys) and tiffinfo (strips), with no warning from any of them.
#include <gtest/gtest.h>
#include <cmath>
#include <regex>
#include "tlrx_enviroment.h"
#include "tlrx_geotiff_test_support.h"
#include "tlrx_platform.h"
#include "tlrx_raster_to_geotiff.h"
#include "tlrx_test_support.h"

namespace {

// Standard output and error of a shell command.
std::string runTool(const std::string &theCommand) {
  std::string aOutput;
  FILE *aPipe = popen((theCommand + " 2>&1").c_str(), "r");
  if (aPipe == nullptr)
    return aOutput;
  std::array<char, 4096> aBuffer;
  size_t aRead;
  while ((aRead = std::fread(aBuffer.data(), 1, aBuffer.size(), aPipe)) > 0)
    aOutput.append(aBuffer.data(), aRead);
  pclose(aPipe);
  return aOutput;
}

bool toolAvailable(const char *theTool) { return runTool(std::string("command -v ") + theTool).size() > 0; }

// The numbers of a JSON array member, e.g. "geoTransform":[...].
std::vector<double> jsonArray(const std::string &theJson, const std::string &theMember) {
  std::vector<double> aValues;
  const size_t aAt = theJson.find("\"" + theMember + "\"");
  if (aAt == std::string::npos)
    return aValues;
  const size_t aOpen = theJson.find('[', aAt);
  const size_t aClose = theJson.find(']', aOpen);
  const std::string aList = theJson.substr(aOpen + 1, aClose - aOpen - 1);
  const std::regex aNumber(R"([-+]?[0-9]*\.?[0-9]+(?:[eE][-+]?[0-9]+)?)");
  for (std::sregex_iterator it(aList.begin(), aList.end(), aNumber), aEnd; it != aEnd; ++it)
    aValues.push_back(std::stod(it->str()));
  return aValues;
}

// gdalinfo -json escapes the quotes inside its WKT text.
std::string epsgInWkt(int theCode) { return "ID[\\\"EPSG\\\"," + std::to_string(theCode) + "]"; }

bool contains(const std::string &theText, const std::string &thePart) {
  return theText.find(thePart) != std::string::npos;
}

std::vector<float> pattern(int theRows, int theCols) {
  std::vector<float> aValues(size_t(theRows) * theCols);
  for (size_t i = 0; i < aValues.size(); ++i)
    aValues[i] = static_cast<float>(1 + i % 37);
  return aValues;
}

class GeoTiffGdalTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override {
    if (!toolAvailable("gdalinfo") || !toolAvailable("listgeo") || !toolAvailable("tiffinfo"))
      GTEST_SKIP() << "gdalinfo, listgeo or tiffinfo not installed";
    tlrxStartLibraryEnvironment(mDir.path());
    fdfSetSleepFunction([](double) {});
    tlrxWriteFile(fdfGetWorkingFilePath(), "0\n\n");
  }
  std::string file(const std::string &theName) const { return mDir.file(theName); }
  // theName converted to theName + ".tif"; what gdalinfo -json says of it,
  // with no warning or error.
  std::string quickLook(const std::string &theName, CDescription &theHeader, const void *theCells, int32_t theRowRed,
                        int32_t theColRed) {
    tlrxWriteGeoTiffRaster(file(theName), theHeader, theCells);
    EXPECT_EQ(tlrx_raster_to_geotiff(file(theName).c_str(), file(theName + ".tif").c_str(), 0.0, theRowRed, theColRed,
                                     1.0, 1.0, false, false, false, false, 254, 1000000, nullptr, nullptr, -1, -1,
                                     -1, -1, false),
              0);
    const std::string aJson = runTool("gdalinfo -json " + file(theName + ".tif"));
    EXPECT_FALSE(contains(aJson, "Warning") || contains(aJson, "ERROR")) << aJson;
    return aJson;
  }
  // The GeoTIFF keys listgeo lists, with no error or warning.
  std::string keys(const std::string &theName) {
    const std::string aKeys = runTool("listgeo " + file(theName + ".tif"));
    EXPECT_FALSE(contains(aKeys, "rror") || contains(aKeys, "arning")) << aKeys;
    return aKeys;
  }
};

} // namespace

TEST_F(GeoTiffGdalTest, UtmSouthQuickLookReadsAsEpsg32732WithItsGeotransform) {
  CDescription aHeader;
  tlrxGeoTiffHeader(aHeader, 40, 60, "FLOAT", "AMPLITUDE");
  tlrxGeoTiffUtm(aHeader, 32, "SOUTH", 412000.0, 7601000.0, 20.0, -20.0);
  const std::string aJson = quickLook("utm", aHeader, pattern(40, 60).data(), 2, 3);
  EXPECT_EQ(jsonArray(aJson, "size"), (std::vector<double>{20, 20}));
  EXPECT_EQ(jsonArray(aJson, "geoTransform"), (std::vector<double>{412000.0, 60.0, 0.0, 7601000.0, 0.0, -40.0}));
  EXPECT_FALSE(contains(aJson, "colorTable"));
  for (const std::string &aPart : {std::string("\"type\":\"Byte\""), epsgInWkt(32732),
                                   std::string("\"colorInterpretation\":\"Gray\"")})
    EXPECT_TRUE(contains(aJson, aPart)) << aPart << " in " << aJson;
  const std::string aKeys = keys("utm");
  for (const char *aKey : {"ProjectedCSTypeGeoKey (Short,1): PCS_WGS84_UTM_zone_32S",
                           "GTRasterTypeGeoKey (Short,1): RasterPixelIsArea",
                           "GTCitationGeoKey (Ascii,19): \"UTM Zone 32S WGS84\""})
    EXPECT_TRUE(contains(aKeys, aKey)) << aKey << " in " << aKeys;
  const std::string aInfo = runTool("tiffinfo " + file("utm.tif"));
  EXPECT_TRUE(contains(aInfo, "Rows/Strip: 20") && contains(aInfo, "Bits/Sample: 8")) << aInfo;
}

TEST_F(GeoTiffGdalTest, GeographicQuickLookReadsAsEpsg4326) {
  CDescription aHeader;
  tlrxGeoTiffHeader(aHeader, 30, 50, "FLOAT", "COHERENCE");
  tlrxGeoTiffGeographic(aHeader, 7.25, 46.5, 0.0005, -0.00025);
  const std::string aJson = quickLook("geo", aHeader, pattern(30, 50).data(), 1, 1);
  EXPECT_EQ(jsonArray(aJson, "size"), (std::vector<double>{50, 30}));
  EXPECT_TRUE(contains(aJson, "\"wkt\":\"GEOGCRS[") && contains(aJson, epsgInWkt(4326))) << aJson;
  const std::vector<double> aTransform = jsonArray(aJson, "geoTransform");
  ASSERT_EQ(aTransform.size(), 6u);
  const std::vector<double> aExpected = {7.25, 0.0005, 0.0, 46.5, 0.0, -0.00025};
  for (int i = 0; i < 6; ++i)
    EXPECT_NEAR(aTransform[i], aExpected[i], 1e-12) << i;
  const std::string aKeys = keys("geo");
  EXPECT_TRUE(contains(aKeys, "GeographicTypeGeoKey (Short,1): GCS_WGS_84")) << aKeys;
  EXPECT_TRUE(contains(aKeys, "GeogAngularUnitsGeoKey (Short,1): Angular_Degree")) << aKeys;
}

TEST_F(GeoTiffGdalTest, OnlyInterferogramsCarryAColourTable) {
  const int aRows = 16, aCols = 16;
  std::vector<float> aCells(size_t(aRows) * aCols * 2);
  for (size_t i = 0; i < aCells.size() / 2; ++i) {
    aCells[2 * i] = static_cast<float>(std::cos(0.2 * i));
    aCells[2 * i + 1] = static_cast<float>(std::sin(0.2 * i));
  }
  CDescription aHeader;
  tlrxGeoTiffHeader(aHeader, aRows, aCols, "FLOAT_COMPLEX", "INTERFEROGRAMME");
  const std::string aJson = quickLook("ifg", aHeader, aCells.data(), 1, 1);
  for (const char *aPart : {"\"colorTable\"", "\"colorInterpretation\":\"Palette\"", "\"count\":256"})
    EXPECT_TRUE(contains(aJson, aPart)) << aPart << " in " << aJson;
  // Radar geometry: no georeferencing beyond the citation.
  EXPECT_FALSE(contains(aJson, "geoTransform")) << aJson;
  CDescription aCoherence;
  tlrxGeoTiffHeader(aCoherence, aRows, aCols, "FLOAT", "COHERENCE");
  EXPECT_FALSE(contains(quickLook("coh", aCoherence, pattern(aRows, aCols).data(), 1, 1), "colorTable"));
}
