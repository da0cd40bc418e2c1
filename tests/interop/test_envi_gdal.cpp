// ENVI headers read back by GDAL: every cell type ENVI can hold in both byte
// orders (size, bands, type, no-data value and the values encoded), map
// positions (geotransform and coordinate system), classification names and colours.
#include "tlrx_description_xml.h"
#include "tlrx_envi_test_support.h"
#include "tlrx_envi_util.h"
#include "tlrx_enviroment.h"
#include "tlrx_standard_header.h"
#include "tlrx_test_support.h"
#include <gtest/gtest.h>
#include <algorithm>
#include <cstring>
#include <sstream>

namespace {

constexpr int32_t CTLRX_PIXELS = 3;
constexpr int32_t CTLRX_LINES = 2;

// Summary of `gdalinfo -json`, one fact per line ("size 3 2", "type 1 Int16").
const char *const CTLRX_SUMMARY_SCRIPT = R"(import json, sys
d = json.load(sys.stdin)
print("driver", d["driverShortName"])
print("size", *d["size"])
print("bands", len(d.get("bands", [])))
for b in d.get("bands", []):
    print("type", b["band"], b["type"])
    if "noDataValue" in b:
        print("nodata", b["band"], repr(float(b["noDataValue"])))
    if "categories" in b:
        print("categories", b["band"], "|".join(b["categories"]))
    if "colorTable" in b:
        print("colors", b["band"], ";".join(",".join(str(c) for c in e[:3]) for e in b["colorTable"]["entries"]))
if "geoTransform" in d:
    print("gt", *[repr(float(v)) for v in d["geoTransform"]])
)";

std::string quoted(const std::string &theText) { return "'" + theText + "'"; }

class EnviGdal : public ::testing::Test {
protected:
  void SetUp() override {
    if (std::system("command -v gdalinfo >/dev/null 2>&1 && command -v python3 >/dev/null 2>&1") != 0)
      GTEST_SKIP() << "gdalinfo or python3 not installed";
    tlrxStartLibraryEnvironment(mDir.path());
    mPreviousWriter = fdfSetEnviHeaderWriter(&fdfEnviHeaderWriter);
    tlrxWriteFile(mDir.file("summary.py"), CTLRX_SUMMARY_SCRIPT);
  }
  void TearDown() override { fdfSetEnviHeaderWriter(mPreviousWriter); }
  // Standard output of theCommand; it must succeed and, when asked, say nothing on standard error.
  std::string run(const std::string &theCommand, bool theQuiet = true) {
    const std::string aErrFile = mDir.file("stderr.txt");
    std::string aOut;
    FILE *aPipe = popen((theCommand + " 2>" + quoted(aErrFile)).c_str(), "r");
    if (aPipe == nullptr)
      return aOut;
    char aBuffer[4096];
    for (size_t aRead; (aRead = std::fread(aBuffer, 1, sizeof(aBuffer), aPipe)) > 0;)
      aOut.append(aBuffer, aRead);
    const int aStatus = pclose(aPipe);
    const std::string aErr = tlrxReadFile(aErrFile);
    EXPECT_EQ(aStatus, 0) << theCommand << ": " << aErr;
    if (theQuiet)
      EXPECT_EQ(aErr, "") << theCommand;
    return aOut;
  }
  // gdalinfo's facts about theRaster; GDAL must read it without complaint.
  std::vector<std::string> gdalFacts(const std::string &theRaster) {
    std::istringstream aIn(run("gdalinfo -json " + quoted(theRaster) + " | python3 " + quoted(mDir.file("summary.py"))));
    std::vector<std::string> aFacts;
    for (std::string aLine; std::getline(aIn, aLine);)
      aFacts.push_back(aLine);
    return aFacts;
  }
  void expectFacts(const std::string &theRaster, const std::vector<std::string> &theExpected) {
    const std::vector<std::string> aFacts = gdalFacts(theRaster);
    for (const std::string &aFact : theExpected)
      EXPECT_NE(std::find(aFacts.begin(), aFacts.end(), aFact), aFacts.end()) << aFact << " of " << theRaster;
  }
  // The cells GDAL reads, as doubles, cell after cell (complex: re, im; two
  // bands: band 1, band 2).
  std::vector<double> gdalValues(const std::string &theRaster, bool theComplex) {
    const std::string aOut = mDir.file("gdal_values.raw");
    run("gdal_translate -q -of ENVI -co INTERLEAVE=BIP -ot " + std::string(theComplex ? "CFloat64" : "Float64") + " " +
            quoted(theRaster) + " " + quoted(aOut),
        false);
    const std::string aBytes = tlrxReadFile(aOut);
    std::vector<double> aValues(aBytes.size() / sizeof(double));
    std::memcpy(aValues.data(), aBytes.data(), aValues.size() * sizeof(double));
    return aValues;
  }
  // proj4 form of the coordinate system, of a raster or of "EPSG:n".
  std::string proj4(const std::string &theSource) {
    std::string aText = run("gdalsrsinfo -o proj4 " + quoted(theSource), false);
    aText.erase(0, aText.find_first_not_of(" \n"));
    aText.erase(aText.find_last_not_of(" \n") + 1);
    return aText;
  }
  // A FLOAT raster of zeros named theName whose header theSetUp completes.
  std::string zeroRaster(const std::string &theName, const std::function<void(CDescription &)> &theSetUp) {
    const std::string aRaster = mDir.file(theName);
    tlrxWriteFile(aRaster, std::string(CTLRX_PIXELS * CTLRX_LINES * 4, '\0'));
    CDescription aHeader;
    tlrxSetRasterLayout(aHeader, CTLRX_PIXELS, CTLRX_LINES, "FLOAT");
    theSetUp(aHeader);
    EXPECT_TRUE(fdfWriteStandardHeader(aRaster.c_str(), aHeader));
    return aRaster;
  }
  CTempDir mDir;
  TLRXEnviHeaderWriter mPreviousWriter = nullptr;
};

struct SCellCase {
  const char *mCellType;
  int mBytes;                        // bytes of one value (one part of a complex cell)
  bool mComplex, mInteger, mSigned;  // two values per cell, integer values, signed values
  int mGdalBands;                    // bands GDAL must show
  const char *mGdalType;
  bool mGdalComplex;
};

const SCellCase CTLRX_CELL_CASES[] = {
    {"UNSIGNED_BYTE", 1, false, true, false, 1, "Byte", false}, {"UBYTE_COMPLEX", 1, true, true, false, 2, "Byte", false},
    {"SHORT", 2, false, true, true, 1, "Int16", false},         {"UNSIGNED_SHORT", 2, false, true, false, 1, "UInt16", false},
    {"SHORT_COMPLEX", 2, true, true, true, 2, "Int16", false},  {"FLOAT", 4, false, false, true, 1, "Float32", false},
    {"FLOAT_COMPLEX", 4, true, false, true, 1, "CFloat32", true}, {"DOUBLE", 8, false, false, true, 1, "Float64", false},
    {"DOUBLE_COMPLEX", 8, true, false, true, 1, "CFloat64", true}, {"UNSIGNED_INT", 4, false, true, false, 1, "UInt32", false},
    {"INT", 4, false, true, true, 1, "Int32", false},           {"UNSIGNED_SHORT_COMPLEX", 2, true, true, false, 2, "UInt16", false},
};

// The values of theCase's cells, part after part: large enough to need every
// byte, negative for signed types, fractional for floats.
std::vector<double> cellValues(const SCellCase &theCase) {
  std::vector<double> aValues;
  for (int aCell = 0; aCell < CTLRX_PIXELS * CTLRX_LINES; ++aCell)
    for (int aPart = 0; aPart < (theCase.mComplex ? 2 : 1); ++aPart) {
      const double aValue = (aCell + 1) * (theCase.mBytes == 1 ? 40.0 : theCase.mBytes == 2 ? 4000.0 : 300000.0) +
                            aPart * 7.0 + (theCase.mInteger ? 0.0 : 0.375);
      aValues.push_back(theCase.mSigned && (aCell + aPart) % 2 == 1 ? -aValue : aValue);
    }
  return aValues;
}

// The raster file of theCase: theOffset junk bytes, then the cells.
std::string encodeRaster(const SCellCase &theCase, bool theMSBF, int theOffset) {
  std::string aBytes(static_cast<size_t>(theOffset), '\x5a');
  for (const double aValue : cellValues(theCase)) {
    uint64_t aBits = static_cast<uint64_t>(static_cast<int64_t>(aValue)); // two's complement
    const float aFloat = static_cast<float>(aValue);
    if (!theCase.mInteger && theCase.mBytes == 4) {
      uint32_t aFloatBits = 0;
      std::memcpy(&aFloatBits, &aFloat, 4);
      aBits = aFloatBits;
    } else if (!theCase.mInteger) {
      std::memcpy(&aBits, &aValue, 8);
    }
    for (int i = 0; i < theCase.mBytes; ++i)
      aBytes += static_cast<char>((aBits >> (8 * (theMSBF ? theCase.mBytes - 1 - i : i))) & 0xffu);
  }
  return aBytes;
}

// Acquisition times fill the description block, whose lines hold " = "
// too: GDAL must not take them for keys.
TEST_F(EnviGdal, EveryCellTypeInBothByteOrdersReadsBackUnchanged) {
  for (const SCellCase &aCase : CTLRX_CELL_CASES) {
    for (const bool aMSBF : {false, true}) {
      const int aOffset = aMSBF ? 16 : 0;
      const std::string aRaster = mDir.file(std::string("cells_") + aCase.mCellType + (aMSBF ? "_msbf" : "_lsbf"));
      SCOPED_TRACE(aRaster);
      tlrxWriteFile(aRaster, encodeRaster(aCase, aMSBF, aOffset));
      CDescription aHeader;
      tlrxSetRasterLayout(aHeader, CTLRX_PIXELS, CTLRX_LINES, aCase.mCellType, aMSBF ? "MSBF" : "LSBF");
      aHeader.getField("RasterInfo.HeaderOffset") = aOffset;
      aHeader.getField("RasterInfo.NullCellValue") = 7.0;
      CDescriptionField &aTimes = aHeader.getField("RasterInfo.OtherInfo");
      aTimes.allocate(2, 2);
      aTimes.setString(0, 0, "MASTER ACQUISITION TIME");
      aTimes.setString(0, 1, "12-JAN-2020 10:11:12.500000");
      aTimes.setString(1, 0, "SLAVE ACQUISITION TIME");
      aTimes.setString(1, 1, "24-JAN-2020 10:11:12.500000");
      ASSERT_TRUE(fdfWriteStandardHeader(aRaster.c_str(), aHeader));
      ASSERT_NE(tlrxReadFile(aRaster + ".hdr").find("MASTER ACQUISITION TIME =12-JAN-2020"), std::string::npos);
      std::vector<std::string> aFacts = {"driver ENVI", "size 3 2", "bands " + std::to_string(aCase.mGdalBands)};
      for (int aBand = 1; aBand <= aCase.mGdalBands; ++aBand) {
        aFacts.push_back("type " + std::to_string(aBand) + " " + aCase.mGdalType);
        aFacts.push_back("nodata " + std::to_string(aBand) + " 7.0");
      }
      expectFacts(aRaster, aFacts);
      EXPECT_EQ(gdalValues(aRaster, aCase.mGdalComplex), cellValues(aCase));
    }
  }
}

TEST_F(EnviGdal, MapPositionsGiveTheirGeotransformAndCoordinateSystem) {
  const std::string aUtm = zeroRaster("utm", [](CDescription &theHeader) {
    tlrxSetUtm(theHeader, 412345.5, 7123456.25, 12.5, 32, "SOUTH");
  });
  expectFacts(aUtm, {"gt 412345.5 12.5 -0.0 7123456.25 -0.0 -12.5"});
  EXPECT_EQ(proj4(aUtm), proj4("EPSG:32732"));
  EXPECT_NE(proj4(aUtm), "");
  const std::string aGeo = zeroRaster("geo", [](CDescription &theHeader) {
    tlrxSetGeographic(theHeader, -3.75, 40.5, 0.25, 0.125);
  });
  expectFacts(aGeo, {"gt -3.75 0.25 -0.0 40.5 -0.0 -0.125"});
  EXPECT_EQ(proj4(aGeo), proj4("EPSG:4326"));
  // A conformal conic projection is understood from its projection info.
  const std::string aLambert = zeroRaster("lambert", [](CDescription &theHeader) {
    tlrxSetUtm(theHeader, 100000.0, 200000.0, 20.0, 31, "NORTH");
    theHeader.getField("CartographicSystem.State") = "LAMBERT";
    theHeader.getField("CartographicSystem.OriginLatitude") = 46.5;
    theHeader.getField("CartographicSystem.CentralMeridian") = 3.0;
    theHeader.getField("CartographicSystem.FalseEasting") = 700000.0;
    theHeader.getField("CartographicSystem.FalseNorthing") = 6600000.0;
    theHeader.getField("CartographicSystem.StandardParallel1") = 49.0;
    theHeader.getField("CartographicSystem.StandardParallel2") = 44.0;
  });
  expectFacts(aLambert, {"gt 100000.0 20.0 -0.0 200000.0 -0.0 -20.0"});
  const std::string aProj = proj4(aLambert);
  for (const char *aTerm : {"+proj=lcc", "+lat_0=46.5", "+lon_0=3", "+lat_1=49", "+lat_2=44", "+x_0=700000",
                            "+y_0=6600000", "+datum=WGS84", "+units=m"})
    EXPECT_NE(aProj.find(aTerm), std::string::npos) << aTerm << " in " << aProj;
}

TEST_F(EnviGdal, ClassificationShowsClassNamesAndColourTable) {
  // Eleven classes: the class lists run over several lines.
  constexpr int32_t aClassCount = 11;
  const std::string aRaster = mDir.file("dates");
  const int32_t aCells[] = {0, 1, 2, 9, 10, 0};
  tlrxWriteFile(aRaster, std::string(reinterpret_cast<const char *>(aCells), sizeof aCells));
  CDescription aHeader;
  tlrxSetRasterLayout(aHeader, CTLRX_PIXELS, CTLRX_LINES, "INT", nullptr);
  aHeader.getField("RasterInfo.DataUnits") = "CLASSIFICATION";
  aHeader.getField("RasterInfo.NullCellValue") = -9999.0;
  CDescriptionField &aNames = aHeader.getField("RasterInfo.ClassificationName");
  aNames.allocate(1, aClassCount);
  aNames.setString(0, "No classified");
  for (int32_t i = 1; i < aClassCount; ++i)
    aNames.setString(i, (std::to_string(i) + "-MAR-2021 05:06:07.000000").c_str());
  const char *const aLutKeys[] = {"RasterInfo.TiffLUTRed", "RasterInfo.TiffLUTGreen", "RasterInfo.TiffLUTBlue"};
  for (const char *aKey : aLutKeys)
    aHeader.getField(aKey).allocate(1, 256);
  // The palette of the min-and-max date classes; class 0 (no data) black.
  std::string aExpectedColours = "colors 1 0,0,0", aExpectedNames = "categories 1 No classified";
  for (int32_t i = 1; i < 256; ++i) {
    const int32_t aRgb[3] = {5 * i % 150 + 100, 15 * i % 250, 5 * i % 100 + 150};
    for (int aPart = 0; aPart < 3; ++aPart)
      aHeader.getField(aLutKeys[aPart]).setInteger(i, aRgb[aPart]);
    if (i < aClassCount) {
      aExpectedColours += ";" + std::to_string(aRgb[0]) + "," + std::to_string(aRgb[1]) + "," + std::to_string(aRgb[2]);
      aExpectedNames += "|" + std::to_string(i) + "-MAR-2021 05:06:07.000000";
    }
  }
  ASSERT_TRUE(fdfWriteStandardHeader(aRaster.c_str(), aHeader));
  expectFacts(aRaster, {"type 1 Int32", aExpectedNames, aExpectedColours, "nodata 1 -9999.0"});
  EXPECT_EQ(gdalValues(aRaster, false), (std::vector<double>{0, 1, 2, 9, 10, 0}));
}

} // namespace
