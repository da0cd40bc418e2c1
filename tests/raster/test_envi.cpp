// ENVI header files: exact text, the names that get none, the vocabulary
// and what a vocabulary may leave out, every cell type, byte orders, map and
// pixel-size lines, classification lines, and the documented skips and
// numbered errors for headers ENVI cannot describe.
#include "tlrx_description_test_support.h"
#include "tlrx_description_xml.h"
#include "tlrx_envi_test_support.h"
#include "tlrx_envi_util.h"
#include "tlrx_enviroment.h"
#include "tlrx_read_write_map_info.h"
#include "tlrx_standard_header.h"
#include "tlrx_trace_test_support.h"
#include <gtest/gtest.h>
#include <unistd.h>
#include <cmath>
#include <sstream>

namespace {

class EnviHeader : public ::testing::Test {
protected:
  void SetUp() override {
    tlrxStartLibraryEnvironment(mDir.path());
    fdfGetEnvVar(mDesDir, "TELLURIX_CEOS_DES_FILES_DIR");
    mPreviousWriter = fdfSetEnviHeaderWriter(&fdfEnviHeaderWriter);
  }
  void TearDown() override {
    if (fdfIsTracing())
      stopTrace();
    fdfSetEnvVar(mDesDir.c_str(), "TELLURIX_CEOS_DES_FILES_DIR");
    fdfSetEnviHeaderWriter(mPreviousWriter);
  }
  void startTrace() { ASSERT_TRUE(tlrxStartTrace()); }
  std::string stopTrace() { return tlrxStopTrace(mDir.path()); }
  std::string target() const { return mDir.file("raster.hdr"); }
  // The ENVI text written for theHeader ("" when the writer skipped it).
  std::string enviText(const CDescription &theHeader, const char *theProfile = nullptr) {
    std::remove(target().c_str());
    if (!fdfWriteEnviHeaderFromDescription(theHeader, target().c_str(), theProfile))
      return "";
    return tlrxReadFile(target());
  }
  // The message of the numbered error theHeader's ENVI header raises, after
  // the ENVI file's name; the file is not left behind.
  std::string refusal(const CDescription &theHeader, const char *theProfile = nullptr) {
    std::string aMessage;
    EXPECT_EQ(tlrxCodeOf([&] { enviText(theHeader, theProfile); }, &aMessage), 261121) << aMessage;
    EXPECT_FALSE(tlrxFileExists(target()));
    return aMessage.rfind(target(), 0) == 0 ? aMessage.substr(target().size()) : aMessage;
  }
  // A vocabulary file for profile theProfile in a folder of its own, which
  // becomes the description-file folder.
  void useVocabulary(const std::string &theProfile, const std::string &theSection) {
    const std::string aDir = mDir.file("des/");
    std::system(("mkdir -p '" + aDir + "'").c_str());
    tlrxWriteFile(aDir + "ENVI_descriptions_" + theProfile + ".des",
                  "<?xml version=\"1.0\" ?>\n<HEADER_INFO>\n<ENVI_HeaderDescriptionType>\n" + theSection +
                      "</ENVI_HeaderDescriptionType>\n</HEADER_INFO>\n");
    fdfSetEnvVar(aDir.c_str(), "TELLURIX_CEOS_DES_FILES_DIR");
  }
  CTempDir mDir;
  std::string mDesDir;
  TLRXEnviHeaderWriter mPreviousWriter = nullptr;
};

// A small radar-geometry FLOAT raster with a null value.
void smallFloatRaster(CDescription &theHeader) {
  tlrxSetRasterLayout(theHeader, 3, 2, "FLOAT");
  theHeader.getField("RasterInfo.NullCellValue") = -9999.0;
  theHeader.getField("RasterInfo.DataUnits") = "AMPLITUDE";
  theHeader.getField("Processing.PixelSpacingRg") = 20.0;
  theHeader.getField("Processing.PixelSpacingAz") = 4.0;
}

const char *const CTLRX_SMALL_FLOAT_TEXT =
    "ENVI\ndescription = {\n   File Imported into ENVI.}\nsamples                   = 3\n"
    "lines                     = 2\nbands                     = 1\nheader offset             = 0\n"
    "file type                 = ENVI Standard\ndata type                 = 4\n"
    "sensor type               = Unknown\ninterleave                = bip\nbyte order                = 0\n"
    "pixel size = {20, 4, units=Meters}\nx start                   = 1\ny start                   = 1\n"
    "Data Ignore Value         = -9999\n";

// The line of theText that starts with thePrefix ("" when none).
std::string lineStarting(const std::string &theText, const std::string &thePrefix) {
  std::istringstream aIn(theText);
  for (std::string aLine; std::getline(aIn, aLine);)
    if (aLine.compare(0, thePrefix.size(), thePrefix) == 0)
      return aLine;
  return "";
}

bool holds(const std::string &theText, const std::string &thePart) { return theText.find(thePart) != std::string::npos; }

TEST(EnviNames, HeaderNamesAndExcludedNames) {
  for (const char *aName : {"/d/result_ratio", "/d/result_ratio_hdr", "/d/result_ratio_HDR", "/d/result_ratio.sml"})
    EXPECT_EQ(fdfEnviHeaderFileName(aName), "/d/result_ratio.hdr") << aName;
  EXPECT_EQ(fdfEnviHeaderFileName("/d/image.raw"), "/d/image.raw.hdr");
  // Exports, orbits and parameter files get no ENVI header.
  for (const char *aName : {"a.tif_hdr", "a.tif", "a_orb", "a_orb_hdr", "a.orb", "a_orb.sml",
                            "a.TellurixParameterExtracted", "a_par", "a_par_hdr", "A.TIF"})
    EXPECT_TRUE(fdfIsEnviHeaderExcluded(aName)) << aName;
  for (const char *aName : {"a", "a_hdr", "a.tiff", "a_orbit", "a.sml", "a_parx"})
    EXPECT_FALSE(fdfIsEnviHeaderExcluded(aName)) << aName;
}

TEST_F(EnviHeader, EveryHeaderWriteAddsTheEnviHeaderButExcludedNames) {
  CDescription aHeader;
  smallFloatRaster(aHeader);
  EXPECT_EQ(enviText(aHeader), CTLRX_SMALL_FLOAT_TEXT);
  ASSERT_TRUE(fdfWriteStandardHeader(mDir.file("result").c_str(), aHeader));
  EXPECT_EQ(tlrxReadFile(mDir.file("result.hdr")), CTLRX_SMALL_FLOAT_TEXT);
  // Given the header name, the ENVI header still lands beside the raster.
  ASSERT_TRUE(fdfWriteStandardHeader(mDir.file("other_hdr").c_str(), aHeader));
  EXPECT_EQ(tlrxReadFile(mDir.file("other.hdr")), CTLRX_SMALL_FLOAT_TEXT);
  EXPECT_FALSE(tlrxFileExists(mDir.file("other_hdr.hdr")));
  startTrace();
  for (const std::string aName : {"scene_orb_hdr", "scene.tif", "scene_par"}) {
    ASSERT_TRUE(fdfWriteStandardHeader(mDir.file(aName).c_str(), aHeader));
    EXPECT_FALSE(tlrxFileExists(mDir.file(aName + ".hdr")) || tlrxFileExists(mDir.file("scene.hdr"))) << aName;
  }
  const std::string aTrace = stopTrace();
  for (const char *aName : {"scene_orb_hdr", "scene.tif"})
    EXPECT_TRUE(holds(aTrace, "writeRasterHeaderEnvi NO CREATE ENVI .hdr for : " + mDir.file(aName))) << aName;
}

TEST_F(EnviHeader, UnreadableOrUnwritableFilesAreNumberedErrors) {
  // A missing header is an error except for shapefiles.
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { fdfWriteRasterHeaderEnvi(mDir.file("missing").c_str()); }, &aMessage), 261122);
  EXPECT_EQ(aMessage, mDir.file("missing"));
  EXPECT_EQ(tlrxCodeOf([&] { fdfWriteRasterHeaderEnvi(mDir.file("roads.shp").c_str()); }), 0);
  EXPECT_FALSE(tlrxFileExists(mDir.file("roads.shp.hdr")));
  // A full disk is said as such: the code stays, the message names the cause.
  CDescription aHeader;
  smallFloatRaster(aHeader);
  const TLRXEnviHeaderWriter aEnvi = fdfSetEnviHeaderWriter(nullptr);
  ASSERT_TRUE(fdfWriteStandardHeader(mDir.file("full").c_str(), aHeader));
  fdfSetEnviHeaderWriter(aEnvi);
  ASSERT_EQ(symlink("/dev/full", mDir.file("full.hdr").c_str()), 0);
  EXPECT_EQ(tlrxCodeOf([&] { fdfWriteRasterHeaderEnvi(mDir.file("full").c_str()); }, &aMessage), 261121);
  EXPECT_EQ(aMessage, mDir.file("full.hdr") + ": cannot be written (No space left on device)");
  const std::string aFile = mDir.file("no_such_dir/raster.hdr");
  EXPECT_EQ(tlrxCodeOf([&] { fdfWriteEnviHeaderFromDescription(aHeader, aFile.c_str()); }, &aMessage), 261121);
  EXPECT_EQ(aMessage, aFile + ": cannot be created (No such file or directory)");
}

TEST_F(EnviHeader, EveryCellTypeHasItsBandsAndDataTypeOrIsSkippedAndItsByteOrder) {
  // ENVI data types: 1 uint8, 2 int16, 3 int32, 4 float32, 5 float64,
  // 6 complex float32, 9 complex float64, 12 uint16, 13 uint32; integer
  // pairs are two bands; signed bytes and bits have no ENVI type.
  const struct {
    const char *mCellType, *mBands, *mDataType; // no bands: no ENVI header
  } aCases[] = {
      {"BYTE", nullptr, nullptr},    {"BYTE_COMPLEX", nullptr, nullptr}, {"UNSIGNED_BYTE", "1", "1"},
      {"UBYTE_COMPLEX", "2", "1"},   {"SHORT", "1", "2"},                {"UNSIGNED_SHORT", "1", "12"},
      {"SHORT_COMPLEX", "2", "2"},   {"FLOAT", "1", "4"},                {"FLOAT_COMPLEX", "1", "6"},
      {"DOUBLE", "1", "5"},          {"DOUBLE_COMPLEX", "1", "9"},       {"UNSIGNED_INT", "1", "13"},
      {"INT", "1", "3"},             {"BIT", nullptr, nullptr},          {"UNSIGNED_SHORT_COMPLEX", "2", "12"},
  };
  startTrace();
  for (const auto &aCase : aCases) {
    SCOPED_TRACE(aCase.mCellType);
    CDescription aHeader;
    tlrxSetRasterLayout(aHeader, 4, 3, aCase.mCellType);
    const std::string aText = enviText(aHeader);
    if (aCase.mBands == nullptr) {
      EXPECT_EQ(aText, "");
      continue;
    }
    EXPECT_EQ(lineStarting(aText, "bands "), std::string("bands                     = ") + aCase.mBands);
    EXPECT_EQ(lineStarting(aText, "data type "), std::string("data type                 = ") + aCase.mDataType);
    EXPECT_EQ(lineStarting(aText, "interleave "), "interleave                = bip");
  }
  const std::string aTrace = stopTrace();
  EXPECT_TRUE(holds(aTrace, "ENVI header not written for " + target() + ": ENVI has no signed 8-bit type (BYTE)"));
  EXPECT_TRUE(holds(aTrace, "ENVI has no packed-bit type (BIT)"));
  // Byte order and header offset.
  CDescription aHeader;
  tlrxSetRasterLayout(aHeader, 4, 3, "SHORT", "MSBF");
  aHeader.getField("RasterInfo.HeaderOffset") = 512;
  const std::string aText = enviText(aHeader);
  EXPECT_EQ(lineStarting(aText, "byte order"), "byte order                = 1");
  EXPECT_EQ(lineStarting(aText, "header offset"), "header offset             = 512");
  // Without "BytesOrder" the raster file takes the machine's order.
  tlrxSetRasterLayout(aHeader, 4, 3, "SHORT", nullptr);
  const uint16_t aOne = 1;
  EXPECT_EQ(lineStarting(enviText(aHeader), "byte order"),
            std::string("byte order                = ") + (*reinterpret_cast<const uint8_t *>(&aOne) == 1 ? "0" : "1"));
}

TEST_F(EnviHeader, MissingOrUnusableFieldsAreNumberedErrors) {
  const struct {
    std::function<void(CDescription &)> mSpoil;
    const char *mMessage;
  } aCases[] = {
      {[](CDescription &theHeader) { theHeader.getField("RasterInfo.CellType") = "float"; },
       ": unknown cell type float"},
      {[](CDescription &theHeader) { theHeader.getField("RasterInfo.NrOfLinesPerImage").unset(); },
       ": RasterInfo.NrOfLinesPerImage is not a positive number"},
      {[](CDescription &theHeader) { theHeader.getField("RasterInfo.NrOfPixelsPerLine") = 0; },
       ": RasterInfo.NrOfPixelsPerLine is not a positive number"},
      {[](CDescription &theHeader) { theHeader.getField("RasterInfo.HeaderOffset") = -8; },
       ": RasterInfo.HeaderOffset is not a byte count"},
  };
  for (const auto &aCase : aCases) {
    CDescription aHeader;
    tlrxSetRasterLayout(aHeader, 4, 3, "FLOAT");
    aCase.mSpoil(aHeader);
    EXPECT_EQ(refusal(aHeader), aCase.mMessage);
  }
  // Geocoding fields.
  for (const char *aKey : {"RegistrationCoordinates.LatNorthing", "RegistrationCoordinates.PixelSpacingLatNorth",
                           "CartographicSystem.Zone", "CartographicSystem.Hemisphere"}) {
    CDescription aHeader;
    smallFloatRaster(aHeader);
    tlrxSetUtm(aHeader, 500000.0, 7000000.0, 10.0, 32, "SOUTH");
    aHeader.getField(aKey).unset();
    EXPECT_EQ(refusal(aHeader), std::string(": ") + aKey + " holds no value");
  }
  CDescription aUtm;
  smallFloatRaster(aUtm);
  tlrxSetUtm(aUtm, 500000.0, 7000000.0, 0.0, 61, "SOUTH");
  EXPECT_EQ(refusal(aUtm), ": CartographicSystem.Zone is not a UTM zone (1 to 60)");
  aUtm.getField("CartographicSystem.Zone") = 32;
  EXPECT_EQ(refusal(aUtm), ": RegistrationCoordinates.PixelSpacingLonEast is not a usable pixel spacing");
  // Not geocoded after all: the radar pixel size is written instead.
  aUtm.getField("RasterInfo.GeocodedImage") = "NotOK";
  EXPECT_TRUE(holds(enviText(aUtm), "pixel size = {20, 4, units=Meters}\n"));
}

TEST_F(EnviHeader, LayoutsEnviCannotDescribeWriteNothingAndRemoveAnEarlierHeader) {
  // No row prefix means no raster: an earlier file is kept.
  CDescription aHeader;
  tlrxSetRasterLayout(aHeader, 4, 3, "FLOAT");
  aHeader.getField("RasterInfo.RowPrefix").unset();
  tlrxWriteFile(target(), "kept");
  startTrace();
  EXPECT_FALSE(fdfWriteEnviHeaderFromDescription(aHeader, target().c_str()));
  EXPECT_TRUE(holds(stopTrace(), "NOT FOUND : RowPrefix"));
  EXPECT_EQ(tlrxReadFile(target()), "kept");
  // Line prefixes and suffixes: an earlier ENVI header goes.
  aHeader.getField("RasterInfo.RowPrefix") = 12;
  tlrxWriteFile(target(), "ENVI\nsamples = 99\n");
  startTrace();
  EXPECT_FALSE(fdfWriteEnviHeaderFromDescription(aHeader, target().c_str()));
  EXPECT_TRUE(holds(stopTrace(), "ENVI has no line prefix or suffix"));
  EXPECT_FALSE(tlrxFileExists(target()));
  tlrxSetRasterLayout(aHeader, 4, 3, "FLOAT");
  aHeader.getField("RasterInfo.RowSuffix") = 2;
  EXPECT_EQ(enviText(aHeader), "");
  // A missing vocabulary writes nothing.
  smallFloatRaster(aHeader);
  startTrace();
  EXPECT_EQ(enviText(aHeader, "absent"), "");
  const std::string aTrace = stopTrace();
  const std::string aVocabulary = mDesDir + "ENVI_descriptions_absent.des";
  EXPECT_TRUE(holds(aTrace, "read : " + aVocabulary));
  EXPECT_TRUE(holds(aTrace, "SEC_FILE_NOT_FOUND : " + aVocabulary));
}

const std::string CTLRX_NARROW_VOCABULARY =
    "<WIDTH_CHAR>16</WIDTH_CHAR>\n<NCOLS_NAME>samples</NCOLS_NAME>\n<NROWS_NAME>lines</NROWS_NAME>\n"
    "<NBANDS_NAME>bands</NBANDS_NAME>\n<SENSOR_TYPE>sensor type</SENSOR_TYPE>\n<LAYOUT_NAME>interleave</LAYOUT_NAME>\n"
    "<LAYOUT_VALS><VectorString NumberOfElements = \"3\"><ValueString>BSQ</ValueString><ValueString>BIL</ValueString>"
    "<ValueString>BIP</ValueString></VectorString></LAYOUT_VALS>\n<BYTEORDER_NAME>byte order</BYTEORDER_NAME>\n"
    "<BYTEORDER_VALS><VectorString NumberOfElements = \"2\"><ValueString>big</ValueString>"
    "<ValueString>little</ValueString></VectorString></BYTEORDER_VALS>\n"
    "<ULXMAP_NAME>x start</ULXMAP_NAME>\n<ULYMAP_NAME>y start</ULYMAP_NAME>\n";

TEST_F(EnviHeader, VocabularyDecidesKeyWordsWidthAndOptionalLines) {
  useVocabulary("narrow", CTLRX_NARROW_VOCABULARY);
  CDescription aHeader;
  smallFloatRaster(aHeader);
  EXPECT_EQ(enviText(aHeader, "narrow"),
            "ENVI\ndescription = {\n   File Imported into ENVI.}\nsamples          = 3\nlines            = 2\n"
            "bands            = 1\nsensor type      = Unknown\ninterleave       = BIP\nbyte order       = little\n"
            "pixel size = {20, 4, units=Meters}\nx start          = 1\ny start          = 1\n"
            "Data Ignore Value = -9999\n");
  // Without a key word for it, a header offset cannot be declared: a reader
  // would take the offset bytes for pixels.
  aHeader.getField("RasterInfo.HeaderOffset") = 100;
  EXPECT_EQ(enviText(aHeader, "narrow"), "");
  // A vocabulary lacking an entry the header needs is a numbered error.
  aHeader.getField("RasterInfo.HeaderOffset") = 0;
  useVocabulary("short", CTLRX_NARROW_VOCABULARY + "<DATATYPE_NAME>data type</DATATYPE_NAME>\n"
                                                   "<DATATYPE_VALS><VectorString NumberOfElements = \"2\">"
                                                   "<ValueString>1</ValueString><ValueString>1</ValueString>"
                                                   "</VectorString></DATATYPE_VALS>\n");
  EXPECT_EQ(refusal(aHeader, "short"),
            ": vocabulary " + mDir.file("des/") + "ENVI_descriptions_short.des has no DATATYPE_VALS entry 7");
  useVocabulary("nowidth", "<NCOLS_NAME>samples</NCOLS_NAME>\n");
  EXPECT_TRUE(holds(refusal(aHeader, "nowidth"), "lacks WIDTH_CHAR"));
}

TEST_F(EnviHeader, AcquisitionTimesFillTheDescriptionAndNaNIsNamed) {
  CDescription aHeader;
  smallFloatRaster(aHeader);
  CDescriptionField &aTable = aHeader.getField("RasterInfo.OtherInfo");
  aTable.allocate(3, 2);
  const char *const aInfo[3][2] = {{"SLAVE ACQUISITION TIME", "24-JAN-2020 10:11:12.000000"},
                                   {"NEW_ACQUISITION TIME", "12-JAN-2020 10:11:12.500000"},
                                   {"SOFTWARE", "Tellurix"}};
  for (int r = 0; r < 3; ++r)
    for (int c = 0; c < 2; ++c)
      aTable.setString(r, c, aInfo[r][c]);
  aHeader.getField("RasterInfo.NullCellValue") = std::nan("");
  const std::string aText = enviText(aHeader);
  EXPECT_EQ(aText.substr(0, aText.find("samples")),
            "ENVI\ndescription = {\n   ACQUISITION TIME =12-JAN-2020 10:11:12.500000\n"
            "   SLAVE ACQUISITION TIME =24-JAN-2020 10:11:12.000000\nFile generated with Tellurix  4.3.000}\n");
  EXPECT_EQ(lineStarting(aText, "Data Ignore Value"), "Data Ignore Value         = NaN");
}

TEST_F(EnviHeader, PixelSizeAndMapInfo) {
  CDescription aHeader;
  smallFloatRaster(aHeader);
  tlrxSetUtm(aHeader, 500000.0, 7000000.0, 12.5, 32, "south");
  const std::string aText = enviText(aHeader);
  EXPECT_TRUE(holds(aText, "byte order                = 0\n"
                           "map info = {UTM, 1, 1, 500000, 7000000, 12.5, 12.5,\n"
                           " 32, South, WGS-84, units=Meters }\n"
                           "x start                   = 1\n"))
      << aText;
  EXPECT_EQ(lineStarting(aText, "pixel size"), "");
  aHeader.getField("CartographicSystem.Hemisphere") = "North";
  EXPECT_TRUE(holds(enviText(aHeader), " 32, North, WGS-84, units=Meters }\n"));
  // Geographic spacings are positive.
  CDescription aGeographic;
  smallFloatRaster(aGeographic);
  tlrxSetGeographic(aGeographic, 4.5, 50.75, 0.25, 0.125);
  EXPECT_TRUE(holds(enviText(aGeographic), "map info = {Geographic Lat/Lon, 1, 1, 4.5, 50.75, 0.25, 0.125, WGS-84, \n"
                                           " units=Degrees}\n"));
  // Slant-range spacing is written as ground range.
  CDescription aRadar;
  smallFloatRaster(aRadar);
  aRadar.getField("Processing.PixelSpacingRg") = 7.9;
  aRadar.getField("InitialGeometry.Projection") = "SLANT_RANGE";
  aRadar.getField("ChannelInfo.IncidenceAngle") = 23.0;
  const std::string aLine = lineStarting(enviText(aRadar), "pixel size");
  ASSERT_EQ(aLine.compare(0, 14, "pixel size = {"), 0) << aLine;
  const double aRange = std::strtod(aLine.c_str() + 14, nullptr);
  EXPECT_NEAR(aRange, 7.9 / std::sin(23.0 / 180.0 * 3.14159265358979323846), 1e-12);
  EXPECT_NEAR(aRange, 20.2, 0.05);
  EXPECT_TRUE(holds(aLine, ", 4, units=Meters}"));
  aRadar.getField("InitialGeometry.Projection") = "GROUND_RANGE";
  EXPECT_EQ(lineStarting(enviText(aRadar), "pixel size"),
            "pixel size = {7.90000000000000035527136788005, 4, units=Meters}");
  // No spacings: no pixel size line, the rest is written.
  aRadar.getField("Processing.PixelSpacingAz").unset();
  const std::string aRadarText = enviText(aRadar);
  EXPECT_EQ(lineStarting(aRadarText, "pixel size"), "");
  EXPECT_TRUE(holds(aRadarText, "x start"));
}

TEST_F(EnviHeader, NamedProjectionsWriteProjectionInfo) {
  CDescription aHeader;
  smallFloatRaster(aHeader);
  tlrxSetUtm(aHeader, 150000.0, 170000.0, 10.0, 31, "NORTH");
  aHeader.getField("CartographicSystem.State") = "LAMBERT72";
  const std::pair<const char *, double> aParameters[] = {
      {"OriginLatitude", 90.0},         {"CentralMeridian", 4.375},      {"FalseEasting", 150000.0},
      {"FalseNorthing", 5400000.0},     {"StandardParallel1", 51.25},    {"StandardParallel2", 49.75}};
  for (const auto &aParameter : aParameters)
    aHeader.getField((std::string("CartographicSystem.") + aParameter.first).c_str()) = aParameter.second;
  const std::string aText = enviText(aHeader);
  EXPECT_EQ(lineStarting(aText, "map info"), "map info = {LAMBERT72, 1.0, 1.0, 150000, 170000, 10, 10, BD72, "
                                             "units=Meters}");
  EXPECT_EQ(lineStarting(aText, "projection info"),
            "projection info = {4, 6378388, 6356911.94612794555723667144775, 90, 4.375, 150000, 5400000, 51.25, "
            "49.75, BD72, LAMBERT72, units=Meters}");
  aHeader.getField("CartographicSystem.State") = "mercator";
  EXPECT_EQ(lineStarting(enviText(aHeader), "projection info"),
            "projection info = {20, 6378137, 6356752.31424517929553985595703, 90, 4.375, 150000, 5400000, WGS-84, "
            "mercator, units=Meters}");
  aHeader.getField("CartographicSystem.State") = "TRANSVERSE_MERCATOR";
  EXPECT_EQ(refusal(aHeader), ": CartographicSystem.ProjectionScaleFactor holds no value");
  for (const auto &aCode : {std::make_pair("LAMBERT", 4), std::make_pair("LAMBERT2008", 4),
                            std::make_pair("GNOMONIC", 13), std::make_pair("MILLER", 18),
                            std::make_pair("POLAR_STEREOGRAPHIC", 31), std::make_pair("ALBERS", 9),
                            std::make_pair("STEREOGRAPHIC", 7), std::make_pair("GAUSS_KRUGER", 3),
                            std::make_pair("UTM-GLOBAL", -1), std::make_pair("SINUSOIDAL", -1)})
    EXPECT_EQ(fdfEnviProjectionCode(aCode.first), aCode.second) << aCode.first;
  // A state without a projection code: no map info and no pixel size.
  aHeader.getField("CartographicSystem.State") = "SINUSOIDAL";
  startTrace();
  const std::string aPlain = enviText(aHeader);
  EXPECT_TRUE(holds(stopTrace(), "unknown cartographic state SINUSOIDAL"));
  EXPECT_EQ(lineStarting(aPlain, "map info") + lineStarting(aPlain, "pixel size"), "");
  EXPECT_TRUE(holds(aPlain, "x start"));
}

TEST_F(EnviHeader, DataUnitsGiveClassificationLinesAndComplexFunctions) {
  CDescription aHeader;
  tlrxSetRasterLayout(aHeader, 4, 3, "INT");
  aHeader.getField("RasterInfo.DataUnits") = "CLASSIFICATION";
  aHeader.getField("RasterInfo.NullCellValue") = -9999.0;
  CDescriptionField &aNames = aHeader.getField("RasterInfo.ClassificationName");
  aNames.allocate(1, 3);
  aNames.setString(0, "No classified");
  aNames.setString(1, "01-JAN-2020, {first}");
  const char *const aLutKeys[] = {"RasterInfo.TiffLUTRed", "RasterInfo.TiffLUTGreen", "RasterInfo.TiffLUTBlue"};
  // The palette of the min-and-max date classes: (5i mod 150) + 100, 15i mod 250, (5i mod 100) + 150.
  for (int aPart = 0; aPart < 3; ++aPart) {
    CDescriptionField &aLut = aHeader.getField(aLutKeys[aPart]);
    aLut.allocate(1, 256);
    for (int32_t i = 0; i < 256; ++i) {
      const int32_t aRgb[3] = {5 * i % 150 + 100, 15 * i % 250, 5 * i % 100 + 150};
      aLut.setInteger(i, i == 1 || i == 2 ? aRgb[aPart] : 0);
    }
  }
  const std::string aText = enviText(aHeader);
  EXPECT_EQ(lineStarting(aText, "file type"), "file type                 = ENVI Classification");
  EXPECT_EQ(aText.substr(aText.find("Data Ignore Value")),
            "Data Ignore Value         = -9999\nclasses = 3\nclass lookup = {\n 0, 0, 0, 105, 15, 155, 110, 30, 160}\n"
            "class names = {\n No classified, 01-JAN-2020   first, No classified}\n");
  EXPECT_FALSE(holds(aText, "ENVI Standard"));
  // A palette shorter than the class list is left out rather than invented.
  aHeader.getField(aLutKeys[2]).allocate(1, 2);
  EXPECT_FALSE(holds(enviText(aHeader), "class lookup"));
  // Without names or values there are no classes to declare.
  aNames.clear();
  const std::string aPlain = enviText(aHeader);
  EXPECT_FALSE(holds(aPlain, "classes"));
  EXPECT_TRUE(holds(aPlain, "ENVI Standard"));
  // The complex function of interferograms and SLCs.
  CDescription aComplex;
  tlrxSetRasterLayout(aComplex, 4, 3, "FLOAT_COMPLEX");
  for (const auto &aCase : {std::make_pair("INTERFEROGRAMME", "complex function = Phase\n"),
                            std::make_pair("FLATTENED INTERFEROGRAMME", "complex function = Phase\n"),
                            std::make_pair("SLC", "complex function = Magnitude\n"), std::make_pair("COHERENCE", "")}) {
    aComplex.getField("RasterInfo.DataUnits") = aCase.first;
    const std::string aComplexText = enviText(aComplex);
    if (*aCase.second == '\0')
      EXPECT_FALSE(holds(aComplexText, "complex function"));
    else
      EXPECT_EQ(aComplexText.substr(aComplexText.size() - std::string(aCase.second).size()), aCase.second) << aCase.first;
  }
}

} // namespace
