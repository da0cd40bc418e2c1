// XML header files: exact written text, round trips of every shape and value
// type, section-wise update, file names, stamped values, and the reader's
// handling of malformed, truncated and hostile files.
#include "tlrx_description_test_support.h"
#include "tlrx_description_xml.h"
#include "tlrx_enviroment.h"
#include "tlrx_trace_test_support.h"
#include "tlrx_xml_element_tree.h"

#include <gtest/gtest.h>

#include <cfloat>
#include <climits>
#include <cmath>
#include <cstdlib>
#include <limits>

namespace {

const char *const CTLRX_TEST_KEYS = R"(; sections of the description file tests
[Sensor]
Name    = S
Lines   = I
Gain    = D
Doppler = VD
Counts  = VI
Labels  = VS
Grid    = MD
Table   = MS
Orbit   = 3VD T X Y   ; struct of vectors
Pos     = 2D Lat Lon  ; struct of scalars
Empty   = VD
[RasterInfo]
NrOfLinesPerImage = I
NrOfPixelsPerLine = I
GeocodedImage     = S
OtherInfo         = MS
Ints              = MI
Words             = MS
Codes             = 2VI A B
Names             = 2VS C D
Flags             = 2S E F
[RegistrationCoordinates]
LatNorthing          = D
LonEasting           = D
PixelSpacingLatNorth = D
PixelSpacingLonEast  = D
[DEMCoordinates]
NorthingCoordinateBegin = D
NorthingGridSize        = D
NorthingCoordinateEnd   = D
EastingCoordinateBegin  = D
EastingGridSize         = D
EastingCoordinateEnd    = D
)";

const std::string CTLRX_ROOT_START =
    "<HEADER_INFO xmlns=\"http://www.tellurix.org/schemas/header\"\n"
    "\txmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\"\n"
    "\txsi:schemaLocation=\"http://www.tellurix.org/schemas/header\n"
    "\thttp://www.tellurix.org/schemas/header/TellurixHeaderSchema_version_1.0.xsd\">\n";

class DescriptionXmlTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }
  void TearDown() override { EXPECT_EQ(fdfScratchBuffersInUse(), 0); }

  void declare(CDescription &theDescription, const std::vector<std::string> &theNames = {"Sensor"}) {
    tlrxDeclare(theDescription, mDir.path(), CTLRX_TEST_KEYS, theNames);
  }
  CDescriptionField &field(CDescription &theDescription, const char *theKey) {
    return theDescription.getField(theKey);
  }
  // The small description of the golden text.
  void fillSmall(CDescription &theDescription) {
    field(theDescription, "Sensor.Name").setString("A&B <x> \"q\" 'a'");
    field(theDescription, "Sensor.Lines").setInteger(512);
    CDescriptionField &aDoppler = field(theDescription, "Sensor.Doppler");
    aDoppler.allocate(1, 2);
    aDoppler.setDouble(0, 0.1);
    aDoppler.setDouble(1, std::nan(""));
    CDescriptionField &aLabels = field(theDescription, "Sensor.Labels");
    aLabels.allocate(1, 2);
    aLabels.setString(0, "x");
    CDescriptionField &aGrid = field(theDescription, "Sensor.Grid");
    aGrid.allocate(1, 2);
    aGrid.setDouble(0, 0, 1e300);
    aGrid.setDouble(0, 1, 6378137.0);
    field(theDescription, "Sensor.Orbit").setNumberOfElements(2);
    const double aOrbit[3][2] = {{0, 1}, {1.5, 2.5}, {-1, -2}};
    const char *aMembers[3] = {"Sensor.T", "Sensor.X", "Sensor.Y"};
    for (int m = 0; m < 3; ++m)
      for (int i = 0; i < 2; ++i)
        field(theDescription, aMembers[m]).setDouble(i, aOrbit[m][i]);
    field(theDescription, "Sensor.Lat").setDouble(45.5);
    field(theDescription, "Sensor.Lon").setDouble(-7.25);
  }
  std::string path(const char *theName) const { return mDir.file(theName); }
};

const char *const CTLRX_SMALL_GOLDEN_BODY = R"(   <Sensor>
      <Name>A&amp;B &lt;x&gt; &quot;q&quot; &apos;a&apos;</Name>
      <Lines>512</Lines>
      <Doppler>
         <VectorDouble NumberOfElements = "2">
            <ValueDouble ID = "0">0.100000000000000005551115123126</ValueDouble>
            <ValueDouble ID = "1">NaN</ValueDouble>
         </VectorDouble>
      </Doppler>
      <Labels>
         <VectorString NumberOfElements = "2">
            <ValueString ID = "0">x</ValueString>
            <ValueString ID = "1">&quot;&quot;</ValueString>
         </VectorString>
      </Labels>
      <Grid>
         <MatrixDouble NumberOfRows = "1" NumberOfColumns = "2">
            <MatrixRowDouble ID = "0">
               <ValueDouble ID = "0">1.0000000000000000525047602552e+300</ValueDouble>
               <ValueDouble ID = "1">6378137</ValueDouble>
            </MatrixRowDouble>
         </MatrixDouble>
      </Grid>
      <Orbit>
         <VectorOfStructs_Orbit NumberOfElements = "2" NumberOfFields = "3">
            <VectorOfStructsValues_Orbit ID = "0">
               <T>0</T>
               <X>1.5</X>
               <Y>-1</Y>
            </VectorOfStructsValues_Orbit>
            <VectorOfStructsValues_Orbit ID = "1">
               <T>1</T>
               <X>2.5</X>
               <Y>-2</Y>
            </VectorOfStructsValues_Orbit>
         </VectorOfStructs_Orbit>
      </Orbit>
      <Pos>
         <Struct_Pos NumberOfFields = "2">
            <Lat>45.5</Lat>
            <Lon>-7.25</Lon>
         </Struct_Pos>
      </Pos>
   </Sensor>
)";

// A header with every value type in every shape, extreme values included.
void fillEverything(CDescription &theDescription) {
  auto aField = [&theDescription](const char *theKey) -> CDescriptionField & { return theDescription.getField(theKey); };
  aField("Sensor.Name").setString("caf\xC3\xA0 \x85 \xA0\xFF \"<&>'\" \t tab");
  aField("Sensor.Lines").setInteger(INT32_MIN);
  aField("Sensor.Gain").setDouble(-0.0);
  const double aDoubles[] = {0.1,     1.0 / 3, -2.5e-7, DBL_MAX, DBL_MIN, 5e-324, -1e300, std::nan(""),
                             INFINITY, -INFINITY, 12345.678};
  CDescriptionField &aDoppler = aField("Sensor.Doppler");
  aDoppler.allocate(1, 11);
  for (int i = 0; i < 11; ++i)
    aDoppler.setDouble(i, aDoubles[i]);
  CDescriptionField &aCounts = aField("Sensor.Counts");
  aCounts.allocate(1, 4);
  aCounts.setInteger(0, INT32_MAX);
  aCounts.setInteger(1, -1);
  aCounts.setInteger(3, 7); // element 2 never set: written and read back as 0
  CDescriptionField &aLabels = aField("Sensor.Labels");
  aLabels.allocate(1, 3);
  aLabels.setString(0, "");
  aLabels.setString(2, "  blanks kept  ");
  CDescriptionField &aGrid = aField("Sensor.Grid");
  aGrid.allocate(3, 2);
  for (int r = 0; r < 3; ++r)
    for (int c = 0; c < 2; ++c)
      aGrid.setDouble(r, c, r * 10.5 - c / 7.0);
  CDescriptionField &aTable = aField("Sensor.Table");
  aTable.allocate(2, 2);
  aTable.setString(0, 0, "KEY");
  aTable.setString(0, 1, "a=b");
  aTable.setString(1, 0, "\xE8t\xE9");
  aField("Sensor.Orbit").setNumberOfElements(3);
  for (int i = 0; i < 3; ++i) {
    aField("Sensor.T").setDouble(i, i * 0.25);
    aField("Sensor.X").setDouble(i, 4e6 + i);
    aField("Sensor.Y").setDouble(i, i == 1 ? std::nan("") : -3e6);
  }
  aField("Sensor.Lat").setDouble(44.123456789012345);
  aField("Sensor.Lon").setDouble(-0.000001);
  CDescriptionField &aInts = aField("RasterInfo.Ints");
  aInts.allocate(2, 3);
  for (int r = 0; r < 2; ++r)
    for (int c = 0; c < 3; ++c)
      aInts.setInteger(r, c, (r + 1) * (c - 1) * 1000003);
  CDescriptionField &aWords = aField("RasterInfo.Words");
  aWords.allocate(1, 2);
  aWords.setString(0, 1, "only the second");
  aField("RasterInfo.Codes").setNumberOfElements(2);
  aField("RasterInfo.A").setInteger(0, 1);
  aField("RasterInfo.A").setInteger(1, 2);
  aField("RasterInfo.B").setInteger(0, -3);
  aField("RasterInfo.B").setInteger(1, -4);
  aField("RasterInfo.Names").setNumberOfElements(2);
  aField("RasterInfo.C").setString(0, "c0");
  aField("RasterInfo.C").setString(1, "c 1");
  aField("RasterInfo.D").setString(0, "<d0>");
  aField("RasterInfo.D").setString(1, "");
  aField("RasterInfo.E").setString("on");
  aField("RasterInfo.F").setString("OK");
}

} // namespace

// ------------------------------------------------------------ writing

TEST_F(DescriptionXmlTest, WritesTheExactLayout) {
  CDescription aDescription;
  declare(aDescription);
  fillSmall(aDescription);
  ASSERT_TRUE(aDescription.writeXML(path("small.sml").c_str(), true, true));
  EXPECT_EQ(tlrxReadFile(path("small.sml")),
            std::string("<?xml version=\"1.0\" ?>\n") + CTLRX_ROOT_START + CTLRX_SMALL_GOLDEN_BODY + "</HEADER_INFO>\n");
}

TEST_F(DescriptionXmlTest, EmptyDescriptionAndParameterRoot) {
  CDescription aDescription;
  declare(aDescription, {"Sensor", "DEMCoordinates"});
  ASSERT_TRUE(aDescription.writeXML(path("empty.sml").c_str(), true, true));
  EXPECT_EQ(tlrxReadFile(path("empty.sml")), std::string("<?xml version=\"1.0\" ?>\n") + CTLRX_ROOT_START +
                                                 "</HEADER_INFO>\n");

  CDescription aParameters;
  declare(aParameters, {"Sensor"});
  aParameters.setRootTag("PARAMETERS");
  ASSERT_TRUE(aParameters.writeXML(path("param.xml").c_str(), true, true));
  EXPECT_EQ(tlrxReadFile(path("param.xml")), "<?xml version=\"1.0\" ?>\n<PARAMETERS>\n</PARAMETERS>\n");
  aParameters.getField("Sensor.Lines").setInteger(3);
  ASSERT_TRUE(aParameters.writeXML(path("param.xml").c_str(), true, true));
  EXPECT_EQ(tlrxReadFile(path("param.xml")),
            "<?xml version=\"1.0\" ?>\n<PARAMETERS>\n   <Sensor>\n      <Lines>3</Lines>\n   </Sensor>\n</PARAMETERS>\n");
}

TEST_F(DescriptionXmlTest, SoftwareStampOverwritesOrAppendsRows) {
  CDescription aDescription;
  declare(aDescription, {"RasterInfo"});
  fdfSetBanner("Tellurix=FE\nedition  4.3.000Jan 13 2011");
  ASSERT_TRUE(aDescription.writeXML(path("a.sml").c_str(), true, true));
  CDescriptionField &aTable = aDescription.getField("RasterInfo.OtherInfo");
  ASSERT_EQ(aTable.getRowNbr(), 1);
  EXPECT_STREQ(aTable.getString(0, 0), "SOFTWARE");
  EXPECT_STREQ(aTable.getString(0, 1), "Tellurix:FE edition  4.3.000Jan 13 2011");

  aTable.allocate(2, 2);
  aTable.setString(0, 0, "DATE");
  aTable.setString(0, 1, "today");
  aTable.setString(1, 0, "SOFTWARE_OLD"); // begins with the key: overwritten
  aTable.setString(1, 1, "old");
  fdfStampSoftware(aDescription);
  ASSERT_EQ(aTable.getRowNbr(), 2);
  EXPECT_STREQ(aTable.getString(1, 1), "Tellurix:FE edition  4.3.000Jan 13 2011");

  aTable.allocate(1, 2);
  aTable.setString(0, 0, "DATE"); // value cell never set
  fdfStampOtherInfo(aDescription, "PROCESSOR", "x=y");
  ASSERT_EQ(aTable.getRowNbr(), 2);
  EXPECT_STREQ(aTable.getString(0, 0), "DATE");
  EXPECT_FALSE(aTable.isSet(0, 1));
  EXPECT_STREQ(aTable.getString(1, 0), "PROCESSOR");
  EXPECT_STREQ(aTable.getString(1, 1), "x:y");
}

TEST_F(DescriptionXmlTest, DemBoxIsDerivedForGeocodedRasters) {
  CDescription aDescription;
  declare(aDescription, {"RasterInfo", "RegistrationCoordinates", "DEMCoordinates"});
  const double aLat = 46.5, aLon = 8.25, aSpacingLat = -0.000833, aSpacingLon = 0.00125;
  aDescription.getField("RasterInfo.NrOfLinesPerImage").setInteger(1200);
  aDescription.getField("RasterInfo.NrOfPixelsPerLine").setInteger(801);
  aDescription.getField("RegistrationCoordinates.LatNorthing").setDouble(aLat);
  aDescription.getField("RegistrationCoordinates.LonEasting").setDouble(aLon);
  aDescription.getField("RegistrationCoordinates.PixelSpacingLatNorth").setDouble(aSpacingLat);
  aDescription.getField("RegistrationCoordinates.PixelSpacingLonEast").setDouble(aSpacingLon);
  EXPECT_FALSE(fdfDeriveDemBox(aDescription)); // not geocoded
  EXPECT_FALSE(aDescription.getField("DEMCoordinates.NorthingGridSize").holdsValue());
  aDescription.getField("RasterInfo.GeocodedImage").setString("ok");
  ASSERT_TRUE(aDescription.writeToFile(path("geo").c_str(), false, true));
  CDescription aRead;
  declare(aRead, {"RasterInfo", "RegistrationCoordinates", "DEMCoordinates"});
  ASSERT_TRUE(aRead.readFromFile(path("geo").c_str(), true));
  EXPECT_DOUBLE_EQ(aRead.getField("DEMCoordinates.NorthingCoordinateBegin").getDouble(), aLat + 1200 * aSpacingLat);
  EXPECT_DOUBLE_EQ(aRead.getField("DEMCoordinates.NorthingGridSize").getDouble(), -aSpacingLat);
  EXPECT_DOUBLE_EQ(aRead.getField("DEMCoordinates.NorthingCoordinateEnd").getDouble(), aLat);
  EXPECT_DOUBLE_EQ(aRead.getField("DEMCoordinates.EastingCoordinateBegin").getDouble(), aLon);
  EXPECT_DOUBLE_EQ(aRead.getField("DEMCoordinates.EastingGridSize").getDouble(), aSpacingLon);
  EXPECT_DOUBLE_EQ(aRead.getField("DEMCoordinates.EastingCoordinateEnd").getDouble(), aLon + 801 * aSpacingLon);
}

// ------------------------------------------------------------ round trips

TEST_F(DescriptionXmlTest, EveryShapeAndValueTypeRoundTrips) {
  CDescription aDescription;
  declare(aDescription, {"Sensor", "RasterInfo"});
  fillEverything(aDescription);
  ASSERT_TRUE(aDescription.writeXML(path("all.sml").c_str(), true, true));
  CDescription aRead;
  declare(aRead, {"Sensor", "RasterInfo"});
  ASSERT_TRUE(aRead.readXML(path("all.sml").c_str(), true));
  // The Latin-1 letter 0xE9 alone is folded to "e" on reading; 0xE8 is not.
  aDescription.getField("Sensor.Table").setString(1, 0, "\xE8te");
  tlrxExpectSameValues(aDescription, aRead);
  EXPECT_EQ(aRead.getField("Sensor.Counts").getInteger(2), 0);
  EXPECT_TRUE(aRead.getField("Sensor.Counts").isSet(2));
  EXPECT_TRUE(std::signbit(aRead.getField("Sensor.Gain").getDouble()));
}

TEST_F(DescriptionXmlTest, ReadingClearsValuesTheFileDoesNotHold) {
  CDescription aDescription;
  declare(aDescription);
  aDescription.getField("Sensor.Lines").setInteger(1);
  ASSERT_TRUE(aDescription.writeXML(path("one.sml").c_str(), true, true));
  CDescription aRead;
  declare(aRead);
  aRead.getField("Sensor.Name").setString("stale");
  aRead.getField("Sensor.Doppler").allocate(1, 3);
  ASSERT_TRUE(aRead.readXML(path("one.sml").c_str(), true));
  EXPECT_FALSE(aRead.getField("Sensor.Name").holdsValue());
  EXPECT_FALSE(aRead.getField("Sensor.Doppler").holdsValue());
  EXPECT_EQ(aRead.getField("Sensor.Lines").getInteger(), 1);
}

TEST_F(DescriptionXmlTest, ValuesAreTakenInDocumentOrderAndNaNByText) {
  tlrxWriteFile(path("order.sml"), "<?xml version=\"1.0\" ?>\n<HEADER_INFO>\n <Sensor>\n"
                                   "  <Doppler><VectorDouble NumberOfElements=\"4\">\n"
                                   "   <ValueDouble ID=\"1\">1.5</ValueDouble>\n"
                                   "   <ValueDouble ID=\"0\">-nan(0x8)</ValueDouble>\n"
                                   "   <ValueDouble ID=\"3\">+NaNQ</ValueDouble>\n"
                                   "   <ValueDouble ID=\"2\">  2e3</ValueDouble>\n"
                                   "  </VectorDouble></Doppler>\n"
                                   "  <Name></Name>\n"
                                   "  <Unknown>ignored</Unknown>\n"
                                   "  <Lines> 7 </Lines>\n"
                                   " </Sensor>\n</HEADER_INFO>\n");
  CDescription aRead;
  declare(aRead);
  ASSERT_TRUE(aRead.readXML(path("order.sml").c_str(), true));
  const CDescriptionField &aDoppler = aRead.getField("Sensor.Doppler");
  EXPECT_EQ(aDoppler.getDouble(0), 1.5);
  EXPECT_TRUE(std::isnan(aDoppler.getDouble(1)));
  EXPECT_TRUE(std::isnan(aDoppler.getDouble(2)));
  EXPECT_EQ(aDoppler.getDouble(3), 2000.0);
  EXPECT_STREQ(aRead.getField("Sensor.Name").getString(), ""); // empty element: empty string
  EXPECT_EQ(aRead.getField("Sensor.Lines").getInteger(), 7);
  // Numbers out of range or not numbers at all are refused, not saturated
  // or read as 0.
  for (const char *aBad : {"<Lines>99999999999</Lines>", "<Gain>&#233;</Gain>"}) {
    tlrxWriteFile(path("bad.sml"), std::string("<HEADER_INFO><Sensor>") + aBad + "</Sensor></HEADER_INFO>\n");
    std::string aMessage;
    EXPECT_EQ(tlrxCodeOf([&] { aRead.readXML(path("bad.sml").c_str(), true); }, &aMessage), 848642) << aBad;
    EXPECT_EQ(aMessage, aBad[1] == 'L' ? "Lines: not an integer: [99999999999]" : "Gain: not a number: [\xE9]");
  }
}

// ------------------------------------------------------------ update mode

TEST_F(DescriptionXmlTest, UpdateKeepsOtherSectionsByteForByte) {
  const std::string aSensor = "   <Sensor>\n"
                              "      <Name>kept &amp; odd  </Name>   \r\n"
                              "\t<Lines>7</Lines>\n"
                              "      <Extra>not declared</Extra>\n"
                              "   </Sensor>\n";
  const std::string aOriginal = std::string("<?xml version=\"1.0\" ?>\n") + CTLRX_ROOT_START +
                                "   <RasterInfo>\n      <NrOfLinesPerImage>1</NrOfLinesPerImage>\n"
                                "      <RasterInfo>nested same name</RasterInfo>\n   </RasterInfo>\n" +
                                aSensor + "</HEADER_INFO>\n";
  tlrxWriteFile(path("upd.sml"), aOriginal);
  CDescription aDescription;
  declare(aDescription, {"Sensor", "RasterInfo"});
  aDescription.getField("RasterInfo.NrOfLinesPerImage").setInteger(2048);
  ASSERT_TRUE(aDescription.writeXML(path("upd.sml").c_str(), false, true));
  const std::string aText = tlrxReadFile(path("upd.sml"));
  const std::string aRaster = "   <RasterInfo>\n      <NrOfLinesPerImage>2048</NrOfLinesPerImage>\n"
                              "      <OtherInfo>\n";
  // RasterInfo replaced in place, Sensor's lines untouched.
  const size_t aAt = aText.find(aRaster);
  ASSERT_NE(aAt, std::string::npos) << aText;
  EXPECT_EQ(aText.substr(0, aAt), std::string("<?xml version=\"1.0\" ?>\n") + CTLRX_ROOT_START);
  EXPECT_EQ(aText.find("nested same name"), std::string::npos);
  EXPECT_EQ(aText.substr(aText.size() - aSensor.size() - 15), aSensor + "</HEADER_INFO>\n");

  // A section the file lacks goes just before the root end tag.
  CDescription aMore;
  declare(aMore, {"Sensor", "DEMCoordinates"});
  aMore.getField("DEMCoordinates.EastingGridSize").setDouble(0.5);
  ASSERT_TRUE(aMore.writeXML(path("upd.sml").c_str(), false, true));
  const std::string aAfter = tlrxReadFile(path("upd.sml"));
  EXPECT_EQ(aAfter, aText.substr(0, aText.size() - 15) +
                        "   <DEMCoordinates>\n      <EastingGridSize>0.5</EastingGridSize>\n   </DEMCoordinates>\n"
                        "</HEADER_INFO>\n");
  // The result reads back with both old and new sections.
  CDescription aRead;
  declare(aRead, {"Sensor", "RasterInfo", "DEMCoordinates"});
  ASSERT_TRUE(aRead.readXML(path("upd.sml").c_str(), true));
  EXPECT_STREQ(aRead.getField("Sensor.Name").getString(), "kept & odd  ");
  EXPECT_EQ(aRead.getField("RasterInfo.NrOfLinesPerImage").getInteger(), 2048);
  EXPECT_EQ(aRead.getField("DEMCoordinates.EastingGridSize").getDouble(), 0.5);
}

TEST_F(DescriptionXmlTest, UpdateThatCannotBePlacedFailsAndLeavesTheFile) {
  CDescription aDescription;
  declare(aDescription);
  aDescription.getField("Sensor.Lines").setInteger(2);
  const std::string aOpen = "<?xml version=\"1.0\" ?>\n<HEADER_INFO>\n   <Sensor>\n      <Lines>1</Lines>\n";
  tlrxWriteFile(path("open.sml"), aOpen); // block never closed
  EXPECT_FALSE(aDescription.writeXML(path("open.sml").c_str(), false, false));
  EXPECT_EQ(tlrxCodeOf([&] { aDescription.writeXML(path("open.sml").c_str(), false, true); }), 261124);
  EXPECT_EQ(tlrxReadFile(path("open.sml")), aOpen);
  tlrxWriteFile(path("noroot.sml"), "plain text\n"); // nowhere to insert
  EXPECT_FALSE(aDescription.writeXML(path("noroot.sml").c_str(), false, false));
  EXPECT_EQ(tlrxReadFile(path("noroot.sml")), "plain text\n");
  // Fresh mode replaces it.
  EXPECT_TRUE(aDescription.writeXML(path("noroot.sml").c_str(), true, false));
  EXPECT_NE(tlrxReadFile(path("noroot.sml")).find("<Lines>2</Lines>"), std::string::npos);
}

TEST_F(DescriptionXmlTest, UpdateNeedsAScratchBuffer) {
  CDescription aDescription;
  declare(aDescription);
  aDescription.getField("Sensor.Lines").setInteger(2);
  ASSERT_TRUE(aDescription.writeXML(path("pool.sml").c_str(), true, true));
  std::string aMessage;
  {
    std::vector<std::unique_ptr<CScratchBuffer>> aAll;
    for (int i = 0; i < CTLRX_DS_POOL_SLOTS; ++i)
      aAll.push_back(std::make_unique<CScratchBuffer>(16));
    EXPECT_EQ(tlrxCodeOf([&] { aDescription.writeXML(path("pool.sml").c_str(), false, true); }, &aMessage), 848646);
  }
  EXPECT_EQ(aMessage, "All pools are busy");
  EXPECT_TRUE(aDescription.writeXML(path("pool.sml").c_str(), false, true));
}

TEST_F(DescriptionXmlTest, UnwritableFieldsFailTheSection) {
  CDescription aDescription;
  declare(aDescription, {"RasterInfo"});
  // Members of unequal lengths have no layout.
  aDescription.getField("RasterInfo.A").allocate(1, 2);
  aDescription.getField("RasterInfo.B").allocate(1, 3);
  EXPECT_FALSE(aDescription.writeXML(path("bad.sml").c_str(), true, false));
  EXPECT_EQ(tlrxCodeOf([&] { aDescription.writeXML(path("bad.sml").c_str(), true, true); }), 261124);
  EXPECT_FALSE(aDescription.writeXML((path("missing_dir/") + "x.sml").c_str(), true, false));
}

// ------------------------------------------------------------ file names

TEST_F(DescriptionXmlTest, HeaderNamesFollowTheSuffixRules) {
  EXPECT_EQ(fdfHeaderFileName("/d/img"), "/d/img_hdr");
  for (const char *aName : {"/d/img_hdr", "/d/img.SML", "/d/img_PAR", "/d/img_map", "/d/img.orb", "/d/img_orb_hdr"})
    EXPECT_EQ(fdfHeaderFileName(aName), aName);
  EXPECT_EQ(fdfHeaderFileName("/d/img.tif"), "/d/img.tif_hdr");
  EXPECT_EQ(fdfXmlHeaderFileName("/d/img_hdr"), "/d/img.sml");
  EXPECT_EQ(fdfXmlHeaderFileName("/d/img_HDR"), "/d/img.sml");
  EXPECT_EQ(fdfXmlHeaderFileName("/d/img.sml"), "/d/img.sml");
  EXPECT_EQ(fdfXmlHeaderFileName("/d/img.sml_hdr"), "/d/img.sml");
  EXPECT_EQ(fdfXmlHeaderFileName("/d/img_par"), "/d/img_par.sml");
  EXPECT_EQ(fdfXmlHeaderFileName("/d/x_orb_hdr"), "/d/x_orb.sml");
  EXPECT_EQ(fdfTextHeaderFileName("/d/img"), "/d/img_hdr");
  EXPECT_EQ(fdfTextHeaderFileName("/d/img.sml"), "/d/img_hdr");
}

TEST_F(DescriptionXmlTest, ReadFromFileTriesSmlFirstThenHdr) {
  CDescription aDescription;
  declare(aDescription);
  aDescription.getField("Sensor.Lines").setInteger(1);
  ASSERT_TRUE(aDescription.writeXML(path("img.sml").c_str(), true, true));
  tlrxWriteFile(path("img_hdr"), "[Sensor]\nLines=2\n");
  CDescription aRead;
  declare(aRead);
  ASSERT_TRUE(aRead.readFromFile(path("img").c_str(), true));
  EXPECT_EQ(aRead.getField("Sensor.Lines").getInteger(), 1);
  std::remove(path("img.sml").c_str());
  ASSERT_TRUE(aRead.readFromFile(path("img").c_str(), true));
  EXPECT_EQ(aRead.getField("Sensor.Lines").getInteger(), 2);
  // An XML file under the "_hdr" name is read as XML.
  ASSERT_TRUE(aDescription.writeXML(path("img_hdr").c_str(), true, true));
  ASSERT_TRUE(aRead.readFromFile(path("img_hdr").c_str(), true));
  EXPECT_EQ(aRead.getField("Sensor.Lines").getInteger(), 1);
  // Nothing there: false and a log line.
  EXPECT_FALSE(aRead.readFromFile(path("none").c_str(), true));
  EXPECT_NE(tlrxReadFile(mDir.file("Process.log")).find("\nFile : " + path("none_hdr") + " Not Found\n\n"),
            std::string::npos);
  // A text form without the section: false, or 261122 when it must exist.
  tlrxWriteFile(path("other_hdr"), "[RasterInfo]\nNrOfLinesPerImage=3\n");
  EXPECT_FALSE(aRead.readFromFile(path("other").c_str(), false));
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { aRead.readFromFile(path("other").c_str(), true); }, &aMessage), 261122);
  EXPECT_EQ(aMessage, path("other_hdr"));
}

TEST_F(DescriptionXmlTest, WriteToFileWritesXmlTextAndCallsTheEnviHook) {
  static std::vector<std::string> sCalls;
  sCalls.clear();
  const TLRXEnviHeaderWriter aPrevious = fdfSetEnviHeaderWriter([](const char *theName) { sCalls.push_back(theName); });
  CDescription aDescription;
  declare(aDescription, {"Sensor", "RasterInfo"});
  fillSmall(aDescription);
  aDescription.getField("Sensor.Labels").setString(1, "y"); // the two forms differ on strings never set
  const bool aWritten = aDescription.writeToFile(path("res").c_str(), true, true);
  fdfSetEnviHeaderWriter(aPrevious);
  ASSERT_TRUE(aWritten);
  ASSERT_EQ(sCalls, std::vector<std::string>{path("res")});
  EXPECT_TRUE(tlrxFileExists(path("res.sml")));
  const std::string aText = tlrxReadFile(path("res_hdr"));
  EXPECT_EQ(aText.substr(0, 9), "[Sensor]\n");
  EXPECT_NE(aText.find("\n[RasterInfo]\nOtherInfo={{\"SOFTWARE\" \""), std::string::npos);
  // Both forms read back to the same values.
  CDescription aFromXml, aFromText;
  declare(aFromXml, {"Sensor", "RasterInfo"});
  declare(aFromText, {"Sensor", "RasterInfo"});
  ASSERT_TRUE(aFromXml.readFromFile(path("res").c_str(), true));
  std::remove(path("res.sml").c_str());
  ASSERT_TRUE(aFromText.readFromFile(path("res").c_str(), true));
  tlrxExpectSameValues(aFromXml, aFromText);
}

// ------------------------------------------------------------ bad files

TEST_F(DescriptionXmlTest, MalformedTruncatedAndGarbageFilesAreRejected) {
  CDescription aDescription;
  declare(aDescription);
  fillSmall(aDescription);
  ASSERT_TRUE(aDescription.writeXML(path("good.sml").c_str(), true, true));
  const std::string aGood = tlrxReadFile(path("good.sml"));
  std::string aGarbage;
  for (int i = 0; i < 4096; ++i)
    aGarbage.push_back(static_cast<char>((i * 7919) % 256));
  const std::vector<std::pair<std::string, std::string>> aCases = {
      {"truncated", aGood.substr(0, aGood.size() / 2)},
      {"cut_in_tag", aGood.substr(0, aGood.find("<Lines>") + 3)},
      {"garbage", aGarbage},
      {"empty", ""},
      {"mismatched", "<HEADER_INFO><Sensor></HEADER_INFO></Sensor>"},
      {"two_roots", "<HEADER_INFO/><HEADER_INFO/>"},
      {"nul", std::string("<HEADER_INFO>\0</HEADER_INFO>\n", 29)},
  };
  for (const auto &[aName, aContent] : aCases) {
    SCOPED_TRACE(aName);
    tlrxWriteFile(path(aName.c_str()), aContent);
    CDescription aRead;
    declare(aRead);
    EXPECT_FALSE(aRead.readXML(path(aName.c_str()).c_str(), false));
    std::string aMessage;
    const std::string aPath = path(aName.c_str());
    EXPECT_EQ(tlrxCodeOf([&] { aRead.readXML(aPath.c_str(), true); }, &aMessage), 261121);
    EXPECT_EQ(aMessage, path(aName.c_str()));
  }
  CDescription aRead;
  declare(aRead);
  EXPECT_EQ(tlrxCodeOf([&] { aRead.readXML(path("absent.sml").c_str(), true); }), 261121);
  // Well-formed, but another root: false without raising.
  tlrxWriteFile(path("root.xml"), "<PARAMETERS><Sensor><Lines>1</Lines></Sensor></PARAMETERS>\n");
  EXPECT_FALSE(aRead.readXML(path("root.xml").c_str(), true));
  tlrxWriteFile(path("nested.xml"), "<X><HEADER_INFO><Sensor><Lines>1</Lines></Sensor></HEADER_INFO></X>\n");
  EXPECT_FALSE(aRead.readXML(path("nested.xml").c_str(), true));
}

TEST_F(DescriptionXmlTest, ExpatErrorTextAndLineReachTheTrace) {
  tlrxWriteFile(path("broken.sml"), "<?xml version=\"1.0\" ?>\n<HEADER_INFO>\n <Sensor>\n  <Lines>1</Line>\n");
  ASSERT_TRUE(tlrxStartTrace());
  CDescription aRead;
  declare(aRead);
  const bool aResult = aRead.readXML(path("broken.sml").c_str(), false);
  const std::string aTrace = tlrxStopTrace(mDir.path());
  EXPECT_FALSE(aResult);
  EXPECT_NE(aTrace.find("mismatched tag at line 4\n  <Lines>1</Line>\n"),
            std::string::npos);
}

TEST_F(DescriptionXmlTest, OverLongLinesAreRefused) {
  const std::string aOpen = "<HEADER_INFO><Sensor><Name>";
  const std::string aClose = "</Name></Sensor></HEADER_INFO>";
  // The longest accepted line, then one character more.
  const std::string aFits(CTLRX_XML_MAX_LINE - aOpen.size() - aClose.size(), 'v');
  tlrxWriteFile(path("long.sml"), "<?xml version=\"1.0\" ?>\n" + aOpen + aFits + aClose + "\r\n");
  CDescription aRead;
  declare(aRead);
  ASSERT_TRUE(aRead.readXML(path("long.sml").c_str(), true));
  EXPECT_EQ(std::strlen(aRead.getField("Sensor.Name").getString()), aFits.size());
  tlrxWriteFile(path("long.sml"), "<?xml version=\"1.0\" ?>\n" + aOpen + aFits + "v" + aClose);
  EXPECT_FALSE(aRead.readXML(path("long.sml").c_str(), false));
  EXPECT_EQ(tlrxCodeOf([&] { aRead.readXML(path("long.sml").c_str(), true); }), 261121);
}

TEST_F(DescriptionXmlTest, BadCountsNeverSizeAnAllocation) {
  struct SCase {
    const char *mName;
    const char *mBody;
  };
  const SCase aCases[] = {
      {"negative", "<Doppler><VectorDouble NumberOfElements=\"-1\"></VectorDouble></Doppler>"},
      {"enormous", "<Doppler><VectorDouble NumberOfElements=\"2147483647\"><ValueDouble>1</ValueDouble>"
                   "</VectorDouble></Doppler>"},
      {"overflow", "<Doppler><VectorDouble NumberOfElements=\"99999999999999999999\"></VectorDouble></Doppler>"},
      {"fewer", "<Doppler><VectorDouble NumberOfElements=\"3\"><ValueDouble>1</ValueDouble>"
                "<ValueDouble>2</ValueDouble></VectorDouble></Doppler>"},
      {"more", "<Doppler><VectorDouble NumberOfElements=\"1\"><ValueDouble>1</ValueDouble>"
               "<ValueDouble>2</ValueDouble></VectorDouble></Doppler>"},
      {"text", "<Doppler><VectorDouble NumberOfElements=\"two\"></VectorDouble></Doppler>"},
      {"absent", "<Doppler><VectorDouble><ValueDouble>1</ValueDouble></VectorDouble></Doppler>"},
      {"rows", "<Grid><MatrixDouble NumberOfRows=\"100000\" NumberOfColumns=\"100000\">"
               "<MatrixRowDouble><ValueDouble>1</ValueDouble></MatrixRowDouble></MatrixDouble></Grid>"},
      {"columns", "<Grid><MatrixDouble NumberOfRows=\"1\" NumberOfColumns=\"2000000000\">"
                  "<MatrixRowDouble><ValueDouble>1</ValueDouble></MatrixRowDouble></MatrixDouble></Grid>"},
      {"ragged", "<Grid><MatrixDouble NumberOfRows=\"2\" NumberOfColumns=\"1\">"
                 "<MatrixRowDouble><ValueDouble>1</ValueDouble></MatrixRowDouble>"
                 "<MatrixRowDouble></MatrixRowDouble></MatrixDouble></Grid>"},
      {"no_rows", "<Grid><MatrixDouble NumberOfRows=\"0\" NumberOfColumns=\"2000000000\"></MatrixDouble></Grid>"},
      {"structs", "<Orbit><VectorOfStructs_Orbit NumberOfElements=\"1000000000\" NumberOfFields=\"3\">"
                  "</VectorOfStructs_Orbit></Orbit>"},
  };
  for (const SCase &aCase : aCases) {
    SCOPED_TRACE(aCase.mName);
    const std::string aFile = path(aCase.mName);
    tlrxWriteFile(aFile, std::string("<HEADER_INFO><Sensor>") + aCase.mBody + "</Sensor></HEADER_INFO>\n");
    CDescription aRead;
    declare(aRead);
    EXPECT_FALSE(aRead.readXML(aFile.c_str(), false));
    EXPECT_EQ(tlrxCodeOf([&] { aRead.readXML(aFile.c_str(), true); }), 261121);
  }
}

TEST_F(DescriptionXmlTest, MissingValuesAndUnusableFieldsRaise) {
  const std::pair<const char *, const char *> aMissing[] = {
      {"empty_number", "<Lines></Lines>"},
      {"no_container", "<Doppler><VectorInteger NumberOfElements=\"0\"/></Doppler>"},
      {"empty_value", "<Doppler><VectorDouble NumberOfElements=\"1\"><ValueDouble/></VectorDouble></Doppler>"},
      {"no_member", "<Orbit><VectorOfStructs_Orbit NumberOfElements=\"1\"><VectorOfStructsValues_Orbit>"
                    "<T>1</T><X>2</X></VectorOfStructsValues_Orbit></VectorOfStructs_Orbit></Orbit>"},
      {"no_struct", "<Pos><Lat>1</Lat></Pos>"},
  };
  for (const auto &[aName, aBody] : aMissing) {
    SCOPED_TRACE(aName);
    tlrxWriteFile(path(aName), std::string("<HEADER_INFO><Sensor>") + aBody + "</Sensor></HEADER_INFO>\n");
    CDescription aRead;
    declare(aRead);
    std::string aMessage;
    const std::string aPath = path(aName);
    EXPECT_EQ(tlrxCodeOf([&] { aRead.readXML(aPath.c_str(), false); }, &aMessage), 848642);
  }
  // A field whose value type no rule recognised.
  CDescription aRead;
  auto aSection = std::make_unique<CDescriptionSection>();
  aSection->setName("Sensor");
  aSection->appendField(std::make_unique<CDescriptionField>("Odd", CTLRX_DS_SCALAR, CTLRX_DS_UNRECOGNISED));
  aRead.addSection(std::move(aSection));
  tlrxWriteFile(path("odd.sml"), "<HEADER_INFO><Sensor><Odd>1</Odd></Sensor></HEADER_INFO>");
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { aRead.readXML(path("odd.sml").c_str(), false); }, &aMessage), 848644);
  EXPECT_EQ(aMessage, "Odd");
}

// ------------------------------------------------------------ list layout

TEST_F(DescriptionXmlTest, ReadXmlSectionTakesTheNamedListEntry) {
  const std::string aFile = path("map.xml");
  tlrxWriteFile(aFile, "<?xml version=\"1.0\" ?>\n<HEADER_INFO NumberOfElements = \"2\">\n"
                       " <SECTION NAME=\"Other\"><Lines>1</Lines></SECTION>\n"
                       " <SECTION NAME=\"Sensor_v2\"><Lines>2</Lines><Name>n</Name></SECTION>\n"
                       "</HEADER_INFO>\n");
  CDescription aDescription;
  declare(aDescription);
  CDescriptionSection &aSection = *aDescription.findSection("Sensor");
  aSection.findField("Gain")->setDouble(3.0);
  ASSERT_TRUE(fdfReadXMLSection(aSection, aFile.c_str(), true));
  EXPECT_EQ(aSection.findField("Lines")->getInteger(), 2);
  EXPECT_STREQ(aSection.findField("Name")->getString(), "n");
  EXPECT_FALSE(aSection.findField("Gain")->holdsValue());

  tlrxWriteFile(aFile, "<HEADER_INFO NumberOfElements=\"3\"><SECTION NAME=\"Sensor\"/></HEADER_INFO>");
  EXPECT_FALSE(fdfReadXMLSection(aSection, aFile.c_str(), true)); // count disagrees
  tlrxWriteFile(aFile, "<HEADER_INFO NumberOfElements=\"1\"><SECTION NAME=\"Sens\"/></HEADER_INFO>");
  EXPECT_FALSE(fdfReadXMLSection(aSection, aFile.c_str(), true)); // no entry with the name
  tlrxWriteFile(aFile, "<OTHER NumberOfElements=\"1\"><SECTION NAME=\"Sensor\"/></OTHER>");
  EXPECT_FALSE(fdfReadXMLSection(aSection, aFile.c_str(), true)); // other root
  tlrxWriteFile(aFile, "<HEADER_INFO NumberOfElements=\"1\"><SECTION NAME=\"Sensor\">");
  EXPECT_FALSE(fdfReadXMLSection(aSection, aFile.c_str(), false));
  EXPECT_EQ(tlrxCodeOf([&] { fdfReadXMLSection(aSection, aFile.c_str(), true); }), 261121);
  // Single sections accept lines of 1,000,000 characters only.
  tlrxWriteFile(aFile, "<HEADER_INFO NumberOfElements=\"1\"><SECTION NAME=\"Sensor\"><Name>" +
                           std::string(CTLRX_XML_SECTION_MAX_LINE, 'n') + "</Name></SECTION></HEADER_INFO>");
  EXPECT_FALSE(fdfReadXMLSection(aSection, aFile.c_str(), false));
}

// Paths and names hold UTF-8 and literal markers: they read back byte for
// byte, in scalars, vectors and matrices alike.
TEST_F(DescriptionXmlTest, Utf8AndLiteralMarkersReadBackExactly) {
  const char *const aTexts[] = {
      "/data/\xC4\x8C" "echy/a_0_rto",          // "Č": its 0x8C once became "<"
      "\xC3\xA9t\xC3\xA9 \xC2\xB0 \xE2\x82\xAC", // é, °, €
      "\xE6\x97\xA5\xE6\x9C\xAC/\xF0\x9F\x8C\x8D", // CJK and a 4-byte sequence
      "/tmp/##amp/x##lt##gt##quot##apos",        // literal markers
      "a#b##c###d####BIG<",
      "&amp; written as text",
      "lone \x8C and \x85 bytes",               // a stray 0x8C once became "<"
  };
  for (const char *aText : aTexts) {
    CDescription aDescription;
    declare(aDescription);
    aDescription.getField("Sensor.Name").setString(aText);
    CDescriptionField &aLabels = aDescription.getField("Sensor.Labels");
    aLabels.allocate(1, 2);
    aLabels.setString(0, 0, aText);
    aLabels.setString(0, 1, "plain");
    ASSERT_TRUE(aDescription.writeXML(path("u.sml").c_str(), true, true));
    CDescription aRead;
    declare(aRead);
    std::string aMessage;
    ASSERT_EQ(tlrxCodeOf([&] { EXPECT_TRUE(aRead.readXML(path("u.sml").c_str(), true)); }, &aMessage), 0)
        << aText << " " << aMessage;
    EXPECT_STREQ(aRead.getField("Sensor.Name").getString(), aText);
    EXPECT_STREQ(aRead.getField("Sensor.Labels").getString(0, 0), aText);
    EXPECT_STREQ(aRead.getField("Sensor.Labels").getString(0, 1), "plain");
  }
}

// A header that is not well-formed is not "missing": the reason, with the
// parser's line, is kept for the caller's message.
TEST_F(DescriptionXmlTest, ReadErrorTellsWhatHappened) {
  CDescription aRead;
  declare(aRead);
  tlrxWriteFile(path("bad.sml"), "<HEADER_INFO>\n<Sensor>\n</Sens>\n</HEADER_INFO>\n");
  EXPECT_FALSE(aRead.readFromFile(path("bad").c_str(), false));
  EXPECT_EQ(aRead.getReadError(), "mismatched tag at line 3 of " + path("bad.sml"));
  tlrxWriteFile(path("root.sml"), "<OTHER/>\n");
  EXPECT_FALSE(aRead.readFromFile(path("root").c_str(), false));
  EXPECT_EQ(aRead.getReadError(), "no root element HEADER_INFO in " + path("root.sml"));
  tlrxWriteFile(path("text_hdr"), "[RasterInfo]\nNrOfLinesPerImage=3\n");
  EXPECT_FALSE(aRead.readFromFile(path("text").c_str(), false));
  EXPECT_EQ(aRead.getReadError(), "section Sensor not found in " + path("text_hdr"));
  // A missing file keeps no reason (its name says it), a success clears it.
  EXPECT_FALSE(aRead.readFromFile(path("none").c_str(), false));
  EXPECT_EQ(aRead.getReadError(), "");
  tlrxWriteFile(path("good_hdr"), "[Sensor]\nLines=2\n");
  EXPECT_FALSE(aRead.readFromFile(path("bad").c_str(), false));
  EXPECT_TRUE(aRead.readFromFile(path("good").c_str(), false));
  EXPECT_EQ(aRead.getReadError(), "");
}
