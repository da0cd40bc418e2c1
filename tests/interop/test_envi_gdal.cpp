// ENVI headers read back by GDAL: for every cell type ENVI can hold, in both
// byte orders, gdalinfo must report our size, bands, data type and no-data
// value, and the values GDAL reads must be the ones the test encoded; map
// positions must give our geotransform and the EPSG coordinate system; a
// classification raster must show its class names and colour table.
#include "tlrx_description_xml.h"
#include "tlrx_envi_test_support.h"
#include "tlrx_envi_util.h"
#include "tlrx_enviroment.h"
#include "tlrx_raster_file.h"
#include "tlrx_standard_header.h"
#include "tlrx_test_support.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <sstream>
#include <vector>

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

struct SRun {
  int mStatus = -1;
  std::string mOut;
  std::string mErr;
};

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

  SRun run(const std::string &theCommand) {
    SRun aRun;
    const std::string aErrFile = mDir.file("stderr.txt");
    FILE *aPipe = popen((theCommand + " 2>" + quoted(aErrFile)).c_str(), "r");
    if (aPipe == nullptr)
      return aRun;
    char aBuffer[4096];
    for (size_t aRead; (aRead = std::fread(aBuffer, 1, sizeof(aBuffer), aPipe)) > 0;)
      aRun.mOut.append(aBuffer, aRead);
    aRun.mStatus = pclose(aPipe);
    aRun.mErr = tlrxReadFile(aErrFile);
    return aRun;
  }

  // gdalinfo's facts about theRaster; GDAL must read it without complaint.
  std::vector<std::string> gdalFacts(const std::string &theRaster) {
    const SRun aRun = run("gdalinfo -json " + quoted(theRaster) + " | python3 " + quoted(mDir.file("summary.py")));
    EXPECT_EQ(aRun.mStatus, 0) << aRun.mErr;
    EXPECT_EQ(aRun.mErr, "") << theRaster;
    std::vector<std::string> aFacts;
    std::istringstream aIn(aRun.mOut);
    for (std::string aLine; std::getline(aIn, aLine);)
      aFacts.push_back(aLine);
    return aFacts;
  }

  // The cells GDAL reads, as doubles, band after band (complex: re, im).
  std::vector<double> gdalValues(const std::string &theRaster, bool theComplex) {
    const std::string aOut = mDir.file("gdal_values.raw");
    const std::string aType = theComplex ? "CFloat64" : "Float64";
    const SRun aRun = run("gdal_translate -q -of ENVI -co INTERLEAVE=BSQ -ot " + aType + " " + quoted(theRaster) + " " +
                          quoted(aOut));
    EXPECT_EQ(aRun.mStatus, 0) << aRun.mErr;
    const std::string aBytes = tlrxReadFile(aOut);
    std::vector<double> aValues(aBytes.size() / sizeof(double));
    std::memcpy(aValues.data(), aBytes.data(), aValues.size() * sizeof(double));
    return aValues;
  }

  // proj4 form of the coordinate system, of a raster or of "EPSG:n".
  std::string proj4(const std::string &theSource) {
    const SRun aRun = run("gdalsrsinfo -o proj4 " + quoted(theSource));
    std::string aText = aRun.mOut;
    aText.erase(0, aText.find_first_not_of(" \n"));
    aText.erase(aText.find_last_not_of(" \n") + 1);
    return aText;
  }

  CTempDir mDir;
  TLRXEnviHeaderWriter mPreviousWriter = nullptr;
};

bool hasFact(const std::vector<std::string> &theFacts, const std::string &theFact) {
  for (const std::string &aFact : theFacts) {
    if (aFact == theFact)
      return true;
  }
  return false;
}

// ------------------------------------------------------- encoding cells

struct SCellCase {
  const char *mCellType;
  int mBytes;       // bytes of one value (one part of a complex cell)
  bool mComplex;    // two values per cell
  bool mInteger;
  bool mSigned;
  int mGdalBands;   // bands GDAL must show
  const char *mGdalType;
  bool mGdalComplex;
};

const SCellCase CTLRX_CELL_CASES[] = {
    {"UNSIGNED_BYTE", 1, false, true, false, 1, "Byte", false},
    {"UBYTE_COMPLEX", 1, true, true, false, 2, "Byte", false},
    {"SHORT", 2, false, true, true, 1, "Int16", false},
    {"UNSIGNED_SHORT", 2, false, true, false, 1, "UInt16", false},
    {"SHORT_COMPLEX", 2, true, true, true, 2, "Int16", false},
    {"FLOAT", 4, false, false, true, 1, "Float32", false},
    {"FLOAT_COMPLEX", 4, true, false, true, 1, "CFloat32", true},
    {"DOUBLE", 8, false, false, true, 1, "Float64", false},
    {"DOUBLE_COMPLEX", 8, true, false, true, 1, "CFloat64", true},
    {"UNSIGNED_INT", 4, false, true, false, 1, "UInt32", false},
    {"INT", 4, false, true, true, 1, "Int32", false},
    {"UNSIGNED_SHORT_COMPLEX", 2, true, true, false, 2, "UInt16", false},
};

// Value of part thePart of cell theCell: large enough to need every byte,
// negative for signed types, fractional for floats.
double cellValue(const SCellCase &theCase, int theCell, int thePart) {
  const double aScale = theCase.mBytes == 1 ? 40.0 : theCase.mBytes == 2 ? 4000.0 : 300000.0;
  double aValue = (theCell + 1) * aScale + thePart * 7.0;
  if (!theCase.mInteger)
    aValue += 0.375;
  if (theCase.mSigned && (theCell + thePart) % 2 == 1)
    aValue = -aValue;
  return aValue;
}

void appendValue(std::string &theOut, const SCellCase &theCase, double theValue, bool theMSBF) {
  uint64_t aBits = 0;
  if (!theCase.mInteger && theCase.mBytes == 4) {
    const float aFloat = static_cast<float>(theValue);
    uint32_t aFloatBits = 0;
    std::memcpy(&aFloatBits, &aFloat, 4);
    aBits = aFloatBits;
  } else if (!theCase.mInteger) {
    std::memcpy(&aBits, &theValue, 8);
  } else {
    aBits = static_cast<uint64_t>(static_cast<int64_t>(theValue)); // two's complement
  }
  for (int i = 0; i < theCase.mBytes; ++i) {
    const int aShift = theMSBF ? theCase.mBytes - 1 - i : i;
    theOut += static_cast<char>((aBits >> (8 * aShift)) & 0xffu);
  }
}

// The raster file of theCase: theOffset junk bytes, then the cells.
std::string encodeRaster(const SCellCase &theCase, bool theMSBF, int theOffset) {
  std::string aBytes(static_cast<size_t>(theOffset), '\x5a');
  for (int aCell = 0; aCell < CTLRX_PIXELS * CTLRX_LINES; ++aCell) {
    for (int aPart = 0; aPart < (theCase.mComplex ? 2 : 1); ++aPart)
      appendValue(aBytes, theCase, cellValue(theCase, aCell, aPart), theMSBF);
  }
  return aBytes;
}

// What GDAL must deliver: band-sequential parts for two-band integer pairs,
// (re, im) pairs for ENVI's complex types, single values otherwise.
std::vector<double> expectedValues(const SCellCase &theCase) {
  std::vector<double> aValues;
  const int aCells = CTLRX_PIXELS * CTLRX_LINES;
  if (theCase.mComplex && !theCase.mGdalComplex) {
    for (int aPart = 0; aPart < 2; ++aPart)
      for (int aCell = 0; aCell < aCells; ++aCell)
        aValues.push_back(cellValue(theCase, aCell, aPart));
  } else {
    for (int aCell = 0; aCell < aCells; ++aCell)
      for (int aPart = 0; aPart < (theCase.mComplex ? 2 : 1); ++aPart)
        aValues.push_back(cellValue(theCase, aCell, aPart));
  }
  return aValues;
}

// ---------------------------------------------------------------- tests

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
      ASSERT_TRUE(fdfWriteStandardHeader(aRaster.c_str(), aHeader));
      ASSERT_TRUE(tlrxFileExists(aRaster + ".hdr"));

      const std::vector<std::string> aFacts = gdalFacts(aRaster);
      EXPECT_TRUE(hasFact(aFacts, "driver ENVI"));
      EXPECT_TRUE(hasFact(aFacts, "size 3 2"));
      EXPECT_TRUE(hasFact(aFacts, "bands " + std::to_string(aCase.mGdalBands)));
      for (int aBand = 1; aBand <= aCase.mGdalBands; ++aBand) {
        EXPECT_TRUE(hasFact(aFacts, "type " + std::to_string(aBand) + " " + aCase.mGdalType)) << aBand;
        EXPECT_TRUE(hasFact(aFacts, "nodata " + std::to_string(aBand) + " 7.0")) << aBand;
      }
      EXPECT_EQ(gdalValues(aRaster, aCase.mGdalComplex), expectedValues(aCase));
    }
  }
}

TEST_F(EnviGdal, RasterFileOutputOpensInGdal) {
  const std::string aRaster = mDir.file("coherence_pair");
  CDescription aHeader;
  tlrxSetRasterLayout(aHeader, CTLRX_PIXELS, CTLRX_LINES, "FLOAT_COMPLEX", "MSBF");
  aHeader.getField("RasterInfo.NullCellValue") = 0.0;
  aHeader.getField("RasterInfo.DataUnits") = "INTERFEROGRAMME";
  // Acquisition times fill the description block, whose lines hold " = " too.
  CDescriptionField &aTimes = aHeader.getField("RasterInfo.OtherInfo");
  aTimes.allocate(2, 2);
  aTimes.setString(0, 0, "MASTER ACQUISITION TIME");
  aTimes.setString(0, 1, "12-JAN-2020 10:11:12.500000");
  aTimes.setString(1, 0, "SLAVE ACQUISITION TIME");
  aTimes.setString(1, 1, "24-JAN-2020 10:11:12.500000");
  {
    CRasterFile aFile;
    aFile.open_write(aRaster.c_str(), aHeader);
    for (int32_t aRow = 0; aRow < CTLRX_LINES; ++aRow) {
      fcomplex aCells[CTLRX_PIXELS];
      for (int32_t aCol = 0; aCol < CTLRX_PIXELS; ++aCol)
        aCells[aCol] = {static_cast<float>(aRow * 10 + aCol) + 0.5f, -static_cast<float>(aCol) - 0.25f};
      aFile.putLine(aRow, aCells);
    }
    aFile.close();
  }
  ASSERT_TRUE(fdfWriteStandardHeader(aRaster.c_str(), aHeader));
  const std::vector<std::string> aFacts = gdalFacts(aRaster);
  EXPECT_TRUE(hasFact(aFacts, "size 3 2"));
  EXPECT_TRUE(hasFact(aFacts, "type 1 CFloat32"));
  EXPECT_NE(tlrxReadFile(aRaster + ".hdr").find("MASTER ACQUISITION TIME =12-JAN-2020"), std::string::npos);
  const std::vector<double> aValues = gdalValues(aRaster, true);
  ASSERT_EQ(aValues.size(), static_cast<size_t>(2 * CTLRX_PIXELS * CTLRX_LINES));
  for (int32_t aRow = 0; aRow < CTLRX_LINES; ++aRow) {
    for (int32_t aCol = 0; aCol < CTLRX_PIXELS; ++aCol) {
      EXPECT_EQ(aValues[2 * (aRow * CTLRX_PIXELS + aCol)], aRow * 10 + aCol + 0.5);
      EXPECT_EQ(aValues[2 * (aRow * CTLRX_PIXELS + aCol) + 1], -aCol - 0.25);
    }
  }
}

TEST_F(EnviGdal, UtmZone32SouthGivesItsGeotransformAndEpsg32732) {
  const std::string aRaster = mDir.file("utm");
  tlrxWriteFile(aRaster, std::string(CTLRX_PIXELS * CTLRX_LINES * 4, '\0'));
  CDescription aHeader;
  tlrxSetRasterLayout(aHeader, CTLRX_PIXELS, CTLRX_LINES, "FLOAT");
  tlrxSetUtm(aHeader, 412345.5, 7123456.25, 12.5, 32, "SOUTH");
  ASSERT_TRUE(fdfWriteStandardHeader(aRaster.c_str(), aHeader));
  EXPECT_TRUE(hasFact(gdalFacts(aRaster), "gt 412345.5 12.5 -0.0 7123456.25 -0.0 -12.5"));
  EXPECT_EQ(proj4(aRaster), proj4("EPSG:32732"));
  EXPECT_NE(proj4(aRaster), "");
}

TEST_F(EnviGdal, GeographicRasterGivesItsGeotransformAndEpsg4326) {
  const std::string aRaster = mDir.file("geo");
  tlrxWriteFile(aRaster, std::string(CTLRX_PIXELS * CTLRX_LINES * 4, '\0'));
  CDescription aHeader;
  tlrxSetRasterLayout(aHeader, CTLRX_PIXELS, CTLRX_LINES, "FLOAT");
  tlrxSetGeographic(aHeader, -3.75, 40.5, 0.25, 0.125);
  ASSERT_TRUE(fdfWriteStandardHeader(aRaster.c_str(), aHeader));
  EXPECT_TRUE(hasFact(gdalFacts(aRaster), "gt -3.75 0.25 -0.0 40.5 -0.0 -0.125"));
  EXPECT_EQ(proj4(aRaster), proj4("EPSG:4326"));
}

TEST_F(EnviGdal, ConformalConicProjectionInfoIsUnderstood) {
  const std::string aRaster = mDir.file("lambert");
  tlrxWriteFile(aRaster, std::string(CTLRX_PIXELS * CTLRX_LINES * 4, '\0'));
  CDescription aHeader;
  tlrxSetRasterLayout(aHeader, CTLRX_PIXELS, CTLRX_LINES, "FLOAT");
  tlrxSetUtm(aHeader, 100000.0, 200000.0, 20.0, 31, "NORTH");
  aHeader.getField("CartographicSystem.State") = "LAMBERT";
  aHeader.getField("CartographicSystem.OriginLatitude") = 46.5;
  aHeader.getField("CartographicSystem.CentralMeridian") = 3.0;
  aHeader.getField("CartographicSystem.FalseEasting") = 700000.0;
  aHeader.getField("CartographicSystem.FalseNorthing") = 6600000.0;
  aHeader.getField("CartographicSystem.StandardParallel1") = 49.0;
  aHeader.getField("CartographicSystem.StandardParallel2") = 44.0;
  ASSERT_TRUE(fdfWriteStandardHeader(aRaster.c_str(), aHeader));
  EXPECT_TRUE(hasFact(gdalFacts(aRaster), "gt 100000.0 20.0 -0.0 200000.0 -0.0 -20.0"));
  const std::string aProj = proj4(aRaster);
  for (const char *aTerm : {"+proj=lcc", "+lat_0=46.5", "+lon_0=3", "+lat_1=49", "+lat_2=44", "+x_0=700000",
                            "+y_0=6600000", "+datum=WGS84", "+units=m"})
    EXPECT_NE(aProj.find(aTerm), std::string::npos) << aTerm << " in " << aProj;
}

TEST_F(EnviGdal, ClassificationShowsClassNamesAndColourTable) {
  // Eleven classes: the class lists run over several lines.
  constexpr int32_t aClassCount = 11;
  const std::string aRaster = mDir.file("dates");
  std::string aCells;
  for (int32_t aClass : {0, 1, 2, 9, 10, 0}) {
    const int32_t aValue = aClass;
    aCells.append(reinterpret_cast<const char *>(&aValue), 4);
  }
  tlrxWriteFile(aRaster, aCells);
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
  std::string aExpectedColours = "colors 1 0,0,0";
  std::string aExpectedNames = "categories 1 No classified";
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
  const std::vector<std::string> aFacts = gdalFacts(aRaster);
  EXPECT_TRUE(hasFact(aFacts, "type 1 Int32"));
  EXPECT_TRUE(hasFact(aFacts, aExpectedNames)) << aExpectedNames;
  EXPECT_TRUE(hasFact(aFacts, aExpectedColours)) << aExpectedColours;
  EXPECT_TRUE(hasFact(aFacts, "nodata 1 -9999.0"));
  EXPECT_EQ(gdalValues(aRaster, false), (std::vector<double>{0, 1, 2, 9, 10, 0}));
}

} // namespace
