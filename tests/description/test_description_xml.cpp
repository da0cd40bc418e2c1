// Header files in their XML (".sml") and text ("_hdr") forms: exact written
// text, round trips of every shape and value type, section-wise update,
// file names, stamped values, the readers' handling of malformed, truncated
// and hostile files; the expat element tree and the byte-level steps around it.
#include "tlrx_description_test_support.h"
#include "tlrx_description_text.h"
#include "tlrx_description_xml.h"
#include "tlrx_standard_header.h"
#include "tlrx_trace_test_support.h"
#include "tlrx_xml_element_tree.h"

#include <cfloat>
#include <cstdio>
#include <climits>
#include <type_traits>

namespace {

const char *const CTLRX_TEST_KEYS = R"([Sensor]
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
[DEMCoordinates]
EastingGridSize = D
)";

const std::string CTLRX_XML_START = "<?xml version=\"1.0\" ?>\n";
const std::string CTLRX_ROOT_START =
    CTLRX_XML_START + "<HEADER_INFO xmlns=\"http://www.tellurix.org/schemas/header\"\n"
                      "\txmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\"\n"
                      "\txsi:schemaLocation=\"http://www.tellurix.org/schemas/header\n"
                      "\thttp://www.tellurix.org/schemas/header/TellurixHeaderSchema_version_1.0.xsd\">\n";

// Allocates theRows rows (a vector: one) for theValues and sets them row
// after row; a nullptr text leaves its cell unset.
template <typename T> void tlrxFill(CDescriptionField &theField, const std::vector<T> &theValues, int32_t theRows = 1) {
  const int32_t aCols = static_cast<int32_t>(theValues.size()) / theRows;
  theField.allocate(theRows, aCols);
  for (int32_t i = 0; i < theRows * aCols; ++i) {
    if constexpr (std::is_same_v<T, const char *>) {
      if (theValues[i] != nullptr)
        theField.setString(i / aCols, i % aCols, theValues[i]);
    } else if constexpr (std::is_same_v<T, double>) {
      theField.setDouble(i / aCols, i % aCols, theValues[i]);
    } else {
      theField.setInteger(i / aCols, i % aCols, theValues[i]);
    }
  }
}

// Sets the elements of the struct theKey, member after member.
void tlrxFillStruct(CDescription &theDescription, const char *theKey, const std::vector<const char *> &theMembers,
                    const std::vector<double> &theValues) {
  const int32_t aCount = static_cast<int32_t>(theValues.size() / theMembers.size());
  theDescription.getField(theKey).setNumberOfElements(aCount);
  for (size_t i = 0; i < theValues.size(); ++i) {
    CDescriptionField &aMember = theDescription.getField(theMembers[i / aCount]);
    if (aMember.getValueType() == CTLRX_DS_INTEGER)
      aMember.setInteger(static_cast<int32_t>(i) % aCount, static_cast<int32_t>(theValues[i]));
    else
      aMember.setDouble(static_cast<int32_t>(i) % aCount, theValues[i]);
  }
}

class DescriptionXmlTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }
  void TearDown() override { EXPECT_EQ(fdfScratchBuffersInUse(), 0); }
  std::string path(const std::string &theName) const { return mDir.file(theName); }
  bool parse(CXmlElementTree &theTree, const std::string &theText, size_t theMaxLine = CTLRX_XML_MAX_LINE) {
    tlrxWriteFile(path("t.xml"), theText);
    return theTree.parseFile(path("t.xml").c_str(), theMaxLine);
  }
  void declare(CDescription &theDescription, const std::vector<std::string> &theNames = {"Sensor"}) {
    tlrxDeclare(theDescription, mDir.path(), CTLRX_TEST_KEYS, theNames);
  }
  // Writes theText under theName and reads it with a fresh Sensor description.
  bool readXml(const std::string &theName, const std::string &theText, bool theRaise, CDescription &theRead) {
    tlrxWriteFile(path(theName), theText);
    theRead.clear();
    declare(theRead);
    return theRead.readXML(path(theName).c_str(), theRaise);
  }
  // The small description of the golden text.
  void fillSmall(CDescription &theDescription) {
    theDescription.getField("Sensor.Name").setString("A&B <x> \"q\" 'a'");
    theDescription.getField("Sensor.Lines").setInteger(512);
    tlrxFill<double>(theDescription.getField("Sensor.Doppler"), {0.1, std::nan("")});
    tlrxFill<const char *>(theDescription.getField("Sensor.Labels"), {"x", nullptr});
    tlrxFill<double>(theDescription.getField("Sensor.Grid"), {1e300, 6378137.0});
    tlrxFillStruct(theDescription, "Sensor.Orbit", {"Sensor.T", "Sensor.X", "Sensor.Y"}, {0, 1, 1.5, 2.5, -1, -2});
    theDescription.getField("Sensor.Lat").setDouble(45.5);
    theDescription.getField("Sensor.Lon").setDouble(-7.25);
  }
};

std::string preprocess(const std::string &theLine) {
  std::string aOut;
  fdfPreprocessXmlLine(theLine.data(), theLine.size(), aOut);
  return aOut;
}

std::string escape(const char *theText) {
  std::string aOut;
  fdfEscapeXmlText(theText, aOut);
  return aOut;
}

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

} // namespace

TEST_F(DescriptionXmlTest, WritesTheExactLayoutEmptyDescriptionsAndAParameterRoot) {
  CDescription aDescription;
  declare(aDescription);
  fillSmall(aDescription);
  ASSERT_TRUE(aDescription.writeXML(path("small.sml").c_str(), true, true));
  EXPECT_EQ(tlrxReadFile(path("small.sml")), CTLRX_ROOT_START + CTLRX_SMALL_GOLDEN_BODY + "</HEADER_INFO>\n");
  CDescription aEmpty;
  declare(aEmpty, {"Sensor", "DEMCoordinates"});
  ASSERT_TRUE(aEmpty.writeXML(path("empty.sml").c_str(), true, true));
  EXPECT_EQ(tlrxReadFile(path("empty.sml")), CTLRX_ROOT_START + "</HEADER_INFO>\n");
  CDescription aParameters;
  declare(aParameters, {"Sensor"});
  aParameters.setRootTag("PARAMETERS");
  ASSERT_TRUE(aParameters.writeXML(path("param.xml").c_str(), true, true));
  EXPECT_EQ(tlrxReadFile(path("param.xml")), CTLRX_XML_START + "<PARAMETERS>\n</PARAMETERS>\n");
  aParameters.getField("Sensor.Lines").setInteger(3);
  ASSERT_TRUE(aParameters.writeXML(path("param.xml").c_str(), true, true));
  EXPECT_EQ(tlrxReadFile(path("param.xml")),
            CTLRX_XML_START + "<PARAMETERS>\n   <Sensor>\n      <Lines>3</Lines>\n   </Sensor>\n</PARAMETERS>\n");
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
  tlrxFill<const char *>(aTable, {"DATE", "today", "SOFTWARE_OLD", "old"}, 2); // begins with the key: overwritten
  fdfStampSoftware(aDescription);
  ASSERT_EQ(aTable.getRowNbr(), 2);
  EXPECT_STREQ(aTable.getString(1, 1), "Tellurix:FE edition  4.3.000Jan 13 2011");
  tlrxFill<const char *>(aTable, {"DATE", nullptr});
  fdfStampOtherInfo(aDescription, "PROCESSOR", "x=y");
  ASSERT_EQ(aTable.getRowNbr(), 2);
  EXPECT_STREQ(aTable.getString(0, 0), "DATE");
  EXPECT_FALSE(aTable.isSet(0, 1));
  EXPECT_STREQ(aTable.getString(1, 0), "PROCESSOR");
  EXPECT_STREQ(aTable.getString(1, 1), "x:y");
}

TEST_F(DescriptionXmlTest, DemBoxIsDerivedForGeocodedRasters) {
  CDescription aDescription, aRead;
  fdfDeclareStandardHeader(aDescription);
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
  const TLRXEnviHeaderWriter aEnvi = fdfSetEnviHeaderWriter(nullptr);
  const bool aWritten = aDescription.writeToFile(path("geo").c_str(), false, true);
  fdfSetEnviHeaderWriter(aEnvi);
  ASSERT_TRUE(aWritten);
  fdfReadStandardHeader(path("geo").c_str(), aRead);
  const std::pair<const char *, double> aBox[] = {{"NorthingCoordinateBegin", aLat + 1200 * aSpacingLat},
                                                  {"NorthingGridSize", -aSpacingLat},
                                                  {"NorthingCoordinateEnd", aLat},
                                                  {"EastingCoordinateBegin", aLon},
                                                  {"EastingGridSize", aSpacingLon},
                                                  {"EastingCoordinateEnd", aLon + 801 * aSpacingLon}};
  for (const auto &[aKey, aValue] : aBox)
    EXPECT_DOUBLE_EQ(aRead.getField(("DEMCoordinates." + std::string(aKey)).c_str()).getDouble(), aValue) << aKey;
}

TEST_F(DescriptionXmlTest, EveryShapeAndValueTypeRoundTrips) {
  CDescription aDescription, aRead;
  declare(aDescription, {"Sensor", "RasterInfo"});
  auto aField = [&aDescription](const char *theKey) -> CDescriptionField & { return aDescription.getField(theKey); };
  aField("Sensor.Name").setString("caf\xC3\xA0 \x85 \xA0\xFF \"<&>'\" \t tab");
  aField("Sensor.Lines").setInteger(INT32_MIN);
  aField("Sensor.Gain").setDouble(-0.0);
  tlrxFill<double>(aField("Sensor.Doppler"), {0.1, 1.0 / 3, -2.5e-7, DBL_MAX, DBL_MIN, 5e-324, -1e300, std::nan(""),
                                              INFINITY, -INFINITY, 12345.678});
  CDescriptionField &aCounts = aField("Sensor.Counts");
  aCounts.allocate(1, 4);
  aCounts.setInteger(0, INT32_MAX);
  aCounts.setInteger(1, -1);
  aCounts.setInteger(3, 7); // element 2 never set: written and read back as 0
  // Paths and names hold UTF-8 and literal markers: they read back byte for byte.
  tlrxFill<const char *>(aField("Sensor.Labels"),
                         {"", nullptr, "  blanks kept  ",
                          "/data/\xC4\x8C" "echy/a_0_rto",                  // "Č": its 0x8C once became "<"
                          "\xC3\xA9t\xC3\xA9 \xC2\xB0 \xE2\x82\xAC",                   // é, °, €
                          "\xE6\x97\xA5\xE6\x9C\xAC/\xF0\x9F\x8C\x8D",                // CJK and a 4-byte sequence
                          "/tmp/##amp/x##lt##gt##quot##apos", "a#b##c###d####BIG<", "&amp; written as text",
                          "lone \x8C and \x85 bytes"}); // a stray 0x8C once became "<"
  tlrxFill<double>(aField("Sensor.Grid"), {0, -1 / 7.0, 10.5, 10.5 - 1 / 7.0, 21, 21 - 1 / 7.0}, 3);
  tlrxFill<const char *>(aField("Sensor.Table"), {"KEY", "a=b", "\xE8t\xE9", nullptr}, 2);
  tlrxFillStruct(aDescription, "Sensor.Orbit", {"Sensor.T", "Sensor.X", "Sensor.Y"},
                 {0, 0.25, 0.5, 4e6, 4e6 + 1, 4e6 + 2, -3e6, std::nan(""), -3e6});
  aField("Sensor.Lat").setDouble(44.123456789012345);
  aField("Sensor.Lon").setDouble(-0.000001);
  tlrxFill<int32_t>(aField("RasterInfo.Ints"), {-1000003, 0, 1000003, -2000006, 0, 2000006}, 2);
  tlrxFill<const char *>(aField("RasterInfo.Words"), {nullptr, "only the second"});
  tlrxFillStruct(aDescription, "RasterInfo.Codes", {"RasterInfo.A", "RasterInfo.B"}, {1, 2, -3, -4});
  aField("RasterInfo.Names").setNumberOfElements(2);
  for (int32_t i = 0; i < 2; ++i) {
    aField("RasterInfo.C").setString(i, i == 0 ? "c0" : "c 1");
    aField("RasterInfo.D").setString(i, i == 0 ? "<d0>" : "");
  }
  aField("RasterInfo.E").setString("on");
  aField("RasterInfo.F").setString("OK");
  ASSERT_TRUE(aDescription.writeXML(path("all.sml").c_str(), true, true));
  declare(aRead, {"Sensor", "RasterInfo"});
  ASSERT_TRUE(aRead.readXML(path("all.sml").c_str(), true));
  // The Latin-1 letter 0xE9 alone is folded to "e" on reading; 0xE8 is not.
  aField("Sensor.Table").setString(1, 0, "\xE8te");
  tlrxExpectSameValues(aDescription, aRead);
  EXPECT_EQ(aRead.getField("Sensor.Counts").getInteger(2), 0);
  EXPECT_TRUE(aRead.getField("Sensor.Counts").isSet(2));
  EXPECT_TRUE(std::signbit(aRead.getField("Sensor.Gain").getDouble()));
}

// Reading takes values in document order, NaN by its text, an empty element as "".
TEST_F(DescriptionXmlTest, ReadingClearsValuesTheFileDoesNotHoldAndTakesDocumentOrder) {
  CDescription aRead;
  declare(aRead);
  aRead.getField("Sensor.Name").setString("stale");
  aRead.getField("Sensor.Doppler").allocate(1, 3);
  tlrxWriteFile(path("one.sml"), "<HEADER_INFO><Sensor><Lines>1</Lines></Sensor></HEADER_INFO>");
  ASSERT_TRUE(aRead.readXML(path("one.sml").c_str(), true));
  EXPECT_FALSE(aRead.getField("Sensor.Name").holdsValue());
  EXPECT_FALSE(aRead.getField("Sensor.Doppler").holdsValue());
  EXPECT_EQ(aRead.getField("Sensor.Lines").getInteger(), 1);
  ASSERT_TRUE(readXml("order.sml", CTLRX_XML_START + "<HEADER_INFO>\n <Sensor>\n"
                                       "  <Doppler><VectorDouble NumberOfElements=\"4\">\n"
                                       "   <ValueDouble ID=\"1\">1.5</ValueDouble>\n"
                                       "   <ValueDouble ID=\"0\">-nan(0x8)</ValueDouble>\n"
                                       "   <ValueDouble ID=\"3\">+NaNQ</ValueDouble>\n"
                                       "   <ValueDouble ID=\"2\">  2e3</ValueDouble>\n"
                                       "  </VectorDouble></Doppler>\n"
                                       "  <Name></Name>\n  <Unknown>ignored</Unknown>\n  <Lines> 7 </Lines>\n"
                                       " </Sensor>\n</HEADER_INFO>\n",
                      true, aRead));
  const CDescriptionField &aDoppler = aRead.getField("Sensor.Doppler");
  EXPECT_EQ(aDoppler.getDouble(0), 1.5);
  EXPECT_TRUE(std::isnan(aDoppler.getDouble(1)));
  EXPECT_TRUE(std::isnan(aDoppler.getDouble(2)));
  EXPECT_EQ(aDoppler.getDouble(3), 2000.0);
  EXPECT_STREQ(aRead.getField("Sensor.Name").getString(), "");
  EXPECT_EQ(aRead.getField("Sensor.Lines").getInteger(), 7);
}

TEST_F(DescriptionXmlTest, UpdateKeepsOtherSectionsByteForByte) {
  const std::string aSensor = "   <Sensor>\n      <Name>kept &amp; odd  </Name>   \r\n\t<Lines>7</Lines>\n"
                              "      <Extra>not declared</Extra>\n   </Sensor>\n";
  tlrxWriteFile(path("upd.sml"), CTLRX_ROOT_START + "   <RasterInfo>\n      <NrOfLinesPerImage>1</NrOfLinesPerImage>" +
                                     "\n      <RasterInfo>nested same name</RasterInfo>\n   </RasterInfo>\n" + aSensor +
                                     "</HEADER_INFO>\n");
  CDescription aDescription, aMore, aRead;
  declare(aDescription, {"Sensor", "RasterInfo"});
  aDescription.getField("RasterInfo.NrOfLinesPerImage").setInteger(2048);
  ASSERT_TRUE(aDescription.writeXML(path("upd.sml").c_str(), false, true));
  const std::string aText = tlrxReadFile(path("upd.sml"));
  // RasterInfo replaced in place, Sensor's lines untouched.
  const size_t aAt = aText.find("   <RasterInfo>\n      <NrOfLinesPerImage>2048</NrOfLinesPerImage>\n");
  ASSERT_NE(aAt, std::string::npos) << aText;
  EXPECT_EQ(aText.substr(0, aAt), CTLRX_ROOT_START);
  EXPECT_EQ(aText.find("nested same name"), std::string::npos);
  EXPECT_EQ(aText.substr(aText.size() - aSensor.size() - 15), aSensor + "</HEADER_INFO>\n");
  // A section the file lacks goes just before the root end tag.
  declare(aMore, {"Sensor", "DEMCoordinates"});
  aMore.getField("DEMCoordinates.EastingGridSize").setDouble(0.5);
  ASSERT_TRUE(aMore.writeXML(path("upd.sml").c_str(), false, true));
  EXPECT_EQ(tlrxReadFile(path("upd.sml")),
            aText.substr(0, aText.size() - 15) +
                "   <DEMCoordinates>\n      <EastingGridSize>0.5</EastingGridSize>\n   </DEMCoordinates>\n"
                "</HEADER_INFO>\n");
  // The result reads back with both old and new sections.
  declare(aRead, {"Sensor", "RasterInfo", "DEMCoordinates"});
  ASSERT_TRUE(aRead.readXML(path("upd.sml").c_str(), true));
  EXPECT_STREQ(aRead.getField("Sensor.Name").getString(), "kept & odd  ");
  EXPECT_EQ(aRead.getField("RasterInfo.NrOfLinesPerImage").getInteger(), 2048);
  EXPECT_EQ(aRead.getField("DEMCoordinates.EastingGridSize").getDouble(), 0.5);
}

TEST_F(DescriptionXmlTest, FailedWritesLeaveTheFile) {
  CDescription aDescription, aBad;
  declare(aDescription);
  aDescription.getField("Sensor.Lines").setInteger(2);
  const std::string aOpen = CTLRX_XML_START + "<HEADER_INFO>\n   <Sensor>\n      <Lines>1</Lines>\n";
  tlrxWriteFile(path("open.sml"), aOpen); // block never closed
  EXPECT_FALSE(aDescription.writeXML(path("open.sml").c_str(), false, false));
  EXPECT_EQ(tlrxCodeOf([&] { aDescription.writeXML(path("open.sml").c_str(), false, true); }), 261124);
  EXPECT_EQ(tlrxReadFile(path("open.sml")), aOpen);
  tlrxWriteFile(path("noroot.sml"), "plain text\n"); // nowhere to insert
  EXPECT_FALSE(aDescription.writeXML(path("noroot.sml").c_str(), false, false));
  EXPECT_EQ(tlrxReadFile(path("noroot.sml")), "plain text\n");
  EXPECT_TRUE(aDescription.writeXML(path("noroot.sml").c_str(), true, false)); // fresh mode replaces it
  EXPECT_NE(tlrxReadFile(path("noroot.sml")).find("<Lines>2</Lines>"), std::string::npos);
  // Members of unequal lengths have no layout.
  declare(aBad, {"RasterInfo"});
  aBad.getField("RasterInfo.A").allocate(1, 2);
  aBad.getField("RasterInfo.B").allocate(1, 3);
  EXPECT_FALSE(aBad.writeXML(path("bad.sml").c_str(), true, false));
  EXPECT_EQ(tlrxCodeOf([&] { aBad.writeXML(path("bad.sml").c_str(), true, true); }), 261124);
  EXPECT_FALSE(aDescription.writeXML(path("missing_dir/x.sml").c_str(), true, false));
}

TEST_F(DescriptionXmlTest, HeaderNamesFollowTheSuffixRules) {
  EXPECT_EQ(fdfHeaderFileName("/d/img"), "/d/img_hdr");
  for (const char *aName : {"/d/img_hdr", "/d/img.SML", "/d/img_PAR", "/d/img_map", "/d/img.orb", "/d/img_orb_hdr"})
    EXPECT_EQ(fdfHeaderFileName(aName), aName);
  EXPECT_EQ(fdfHeaderFileName("/d/img.tif"), "/d/img.tif_hdr");
  const std::pair<const char *, const char *> aXml[] = {
      {"/d/img_hdr", "/d/img.sml"},     {"/d/img_HDR", "/d/img.sml"},    {"/d/img.sml", "/d/img.sml"},
      {"/d/img.sml_hdr", "/d/img.sml"}, {"/d/img_par", "/d/img_par.sml"}, {"/d/x_orb_hdr", "/d/x_orb.sml"}};
  for (const auto &[aName, aExpected] : aXml)
    EXPECT_EQ(fdfXmlHeaderFileName(aName), aExpected);
  EXPECT_EQ(fdfTextHeaderFileName("/d/img"), "/d/img_hdr");
  EXPECT_EQ(fdfTextHeaderFileName("/d/img.sml"), "/d/img_hdr");
}

// The ".sml" form first, then "_hdr" in either form. The reason a header
// could not be read is kept for the caller's message; a success clears it.
TEST_F(DescriptionXmlTest, ReadFromFileTriesSmlFirstThenHdrAndKeepsTheReason) {
  CDescription aDescription, aRead;
  declare(aDescription);
  aDescription.getField("Sensor.Lines").setInteger(1);
  ASSERT_TRUE(aDescription.writeXML(path("img.sml").c_str(), true, true));
  tlrxWriteFile(path("img_hdr"), "[Sensor]\nLines=2\n");
  declare(aRead);
  ASSERT_TRUE(aRead.readFromFile(path("img").c_str(), true));
  EXPECT_EQ(aRead.getField("Sensor.Lines").getInteger(), 1);
  std::remove(path("img.sml").c_str());
  ASSERT_TRUE(aRead.readFromFile(path("img").c_str(), true));
  EXPECT_EQ(aRead.getField("Sensor.Lines").getInteger(), 2);
  ASSERT_TRUE(aDescription.writeXML(path("img_hdr").c_str(), true, true));
  ASSERT_TRUE(aRead.readFromFile(path("img_hdr").c_str(), true));
  EXPECT_EQ(aRead.getField("Sensor.Lines").getInteger(), 1);
  tlrxWriteFile(path("bad.sml"), "<HEADER_INFO>\n<Sensor>\n</Sens>\n</HEADER_INFO>\n");
  EXPECT_FALSE(aRead.readFromFile(path("bad").c_str(), false));
  EXPECT_EQ(aRead.getReadError(), "mismatched tag at line 3 of " + path("bad.sml"));
  tlrxWriteFile(path("root.sml"), "<OTHER/>\n");
  EXPECT_FALSE(aRead.readFromFile(path("root").c_str(), false));
  EXPECT_EQ(aRead.getReadError(), "no root element HEADER_INFO in " + path("root.sml"));
  // A text form without the section: false, or 261122 when it must exist.
  tlrxWriteFile(path("other_hdr"), "[RasterInfo]\nNrOfLinesPerImage=3\n");
  EXPECT_FALSE(aRead.readFromFile(path("other").c_str(), false));
  EXPECT_EQ(aRead.getReadError(), "section Sensor not found in " + path("other_hdr"));
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { aRead.readFromFile(path("other").c_str(), true); }, &aMessage), 261122);
  EXPECT_EQ(aMessage, path("other_hdr"));
  EXPECT_FALSE(aRead.readFromFile(path("none").c_str(), true));
  EXPECT_EQ(aRead.getReadError(), "");
  EXPECT_NE(tlrxReadFile(path("Process.log")).find("\nFile : " + path("none_hdr") + " Not Found\n\n"),
            std::string::npos);
  EXPECT_FALSE(aRead.readFromFile(path("bad").c_str(), false));
  EXPECT_TRUE(aRead.readFromFile(path("img").c_str(), false));
  EXPECT_EQ(aRead.getReadError(), "");
}

TEST_F(DescriptionXmlTest, WriteToFileWritesXmlTextAndCallsTheEnviHook) {
  static std::vector<std::string> sCalls;
  sCalls.clear();
  const TLRXEnviHeaderWriter aPrevious = fdfSetEnviHeaderWriter([](const char *theName) { sCalls.push_back(theName); });
  CDescription aDescription, aFromXml, aFromText;
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
  declare(aFromXml, {"Sensor", "RasterInfo"});
  declare(aFromText, {"Sensor", "RasterInfo"});
  ASSERT_TRUE(aFromXml.readFromFile(path("res").c_str(), true));
  std::remove(path("res.sml").c_str());
  ASSERT_TRUE(aFromText.readFromFile(path("res").c_str(), true));
  tlrxExpectSameValues(aFromXml, aFromText);
}

TEST_F(DescriptionXmlTest, MalformedTruncatedGarbageAndOverLongFilesAreRejected) {
  CDescription aDescription, aRead;
  declare(aDescription);
  fillSmall(aDescription);
  ASSERT_TRUE(aDescription.writeXML(path("good.sml").c_str(), true, true));
  const std::string aGood = tlrxReadFile(path("good.sml"));
  std::string aGarbage;
  for (int i = 0; i < 4096; ++i)
    aGarbage.push_back(static_cast<char>((i * 7919) % 256));
  // The longest accepted line, and one character more.
  const std::string aOpen = "<HEADER_INFO><Sensor><Name>", aClose = "</Name></Sensor></HEADER_INFO>";
  const std::string aFits(CTLRX_XML_MAX_LINE - aOpen.size() - aClose.size(), 'v');
  const std::pair<std::string, std::string> aCases[] = {
      {"truncated", aGood.substr(0, aGood.size() / 2)},
      {"cut_in_tag", aGood.substr(0, aGood.find("<Lines>") + 3)},
      {"garbage", aGarbage},
      {"empty", ""},
      {"mismatched", "<HEADER_INFO><Sensor></HEADER_INFO></Sensor>"},
      {"two_roots", "<HEADER_INFO/><HEADER_INFO/>"},
      {"nul", std::string("<HEADER_INFO>\0</HEADER_INFO>\n", 29)},
      {"long", CTLRX_XML_START + aOpen + aFits + "v" + aClose}};
  for (const auto &[aName, aContent] : aCases) {
    SCOPED_TRACE(aName);
    EXPECT_FALSE(readXml(aName, aContent, false, aRead));
    std::string aMessage;
    const std::string aPath = path(aName);
    EXPECT_EQ(tlrxCodeOf([&] { aRead.readXML(aPath.c_str(), true); }, &aMessage), 261121);
    EXPECT_EQ(aMessage, aPath);
  }
  EXPECT_EQ(tlrxCodeOf([&] { aRead.readXML(path("absent.sml").c_str(), true); }), 261121);
  ASSERT_TRUE(readXml("fits.sml", CTLRX_XML_START + aOpen + aFits + aClose + "\r\n", true, aRead));
  EXPECT_EQ(std::strlen(aRead.getField("Sensor.Name").getString()), aFits.size());
  // Well-formed, but another root: false without raising.
  EXPECT_FALSE(readXml("root.xml", "<PARAMETERS><Sensor><Lines>1</Lines></Sensor></PARAMETERS>\n", true, aRead));
  EXPECT_FALSE(readXml("nested.xml", "<X><HEADER_INFO><Sensor><Lines>1</Lines></Sensor></HEADER_INFO></X>\n", true,
                       aRead));
  // The parser's text and line reach the trace.
  ASSERT_TRUE(tlrxStartTrace());
  const bool aResult =
      readXml("broken.sml", CTLRX_XML_START + "<HEADER_INFO>\n <Sensor>\n  <Lines>1</Line>\n", false, aRead);
  EXPECT_FALSE(aResult);
  EXPECT_NE(tlrxStopTrace(mDir.path()).find("mismatched tag at line 4\n  <Lines>1</Line>\n"), std::string::npos);
}

// Counts that disagree with the values, or no number at all, never size an
// allocation; a missing value, or a field of no usable type, raises.
TEST_F(DescriptionXmlTest, BadCountsMissingValuesAndUnusableFieldsAreRefused) {
  const std::string aOne = "<ValueDouble>1</ValueDouble>", aRow = "<MatrixRowDouble>" + aOne + "</MatrixRowDouble>";
  auto aVector = [](const std::string &theCount, const std::string &theValues) {
    return "<Doppler><VectorDouble" + theCount + ">" + theValues + "</VectorDouble></Doppler>";
  };
  auto aMatrix = [](const char *theRows, const char *theCols, const std::string &theValues) {
    return std::string("<Grid><MatrixDouble NumberOfRows=\"") + theRows + "\" NumberOfColumns=\"" + theCols + "\">" +
           theValues + "</MatrixDouble></Grid>";
  };
  const struct {
    const char *mName;
    std::string mBody;
    int32_t mCode; // raised when read without raising, 0: refused quietly
    const char *mMessage = nullptr;
  } aCases[] = {
      {"negative", aVector(" NumberOfElements=\"-1\"", ""), 0},
      {"enormous", aVector(" NumberOfElements=\"2147483647\"", aOne), 0},
      {"overflow", aVector(" NumberOfElements=\"99999999999999999999\"", ""), 0},
      {"fewer", aVector(" NumberOfElements=\"3\"", aOne + aOne), 0},
      {"more", aVector(" NumberOfElements=\"1\"", aOne + aOne), 0},
      {"text", aVector(" NumberOfElements=\"two\"", ""), 0},
      {"absent", aVector("", aOne), 0},
      {"rows", aMatrix("100000", "100000", aRow), 0},
      {"columns", aMatrix("1", "2000000000", aRow), 0},
      {"ragged", aMatrix("2", "1", aRow + "<MatrixRowDouble></MatrixRowDouble>"), 0},
      {"no_rows", aMatrix("0", "2000000000", ""), 0},
      {"structs", "<Orbit><VectorOfStructs_Orbit NumberOfElements=\"1000000000\" NumberOfFields=\"3\">"
                  "</VectorOfStructs_Orbit></Orbit>", 0},
      {"empty_number", "<Lines></Lines>", 848642},
      {"no_container", "<Doppler><VectorInteger NumberOfElements=\"0\"/></Doppler>", 848642},
      {"empty_value", aVector(" NumberOfElements=\"1\"", "<ValueDouble/>"), 848642},
      {"no_member", "<Orbit><VectorOfStructs_Orbit NumberOfElements=\"1\"><VectorOfStructsValues_Orbit>"
                    "<T>1</T><X>2</X></VectorOfStructsValues_Orbit></VectorOfStructs_Orbit></Orbit>", 848642},
      {"no_struct", "<Pos><Lat>1</Lat></Pos>", 848642},
      // Numbers are read whole, vector elements too: junk names the field.
      {"junk", "<Gain>1e999</Gain>", 848642, "Gain: not a number: [1e999]"},
      {"junk_element", "<Counts><VectorInteger NumberOfElements=\"2\"><ValueInteger>1</ValueInteger><ValueInteger>2x"
                       "</ValueInteger></VectorInteger></Counts>", 848642, "Counts: not an integer: [2x]"}};
  for (const auto &aCase : aCases) {
    SCOPED_TRACE(aCase.mName);
    CDescription aRead;
    bool aResult = true;
    const std::string aText = "<HEADER_INFO><Sensor>" + aCase.mBody + "</Sensor></HEADER_INFO>\n";
    std::string aMessage;
    EXPECT_EQ(tlrxCodeOf([&] { aResult = readXml(aCase.mName, aText, false, aRead); }, &aMessage), aCase.mCode);
    if (aCase.mMessage != nullptr)
      EXPECT_EQ(aMessage, aCase.mMessage);
    if (aCase.mCode == 0) {
      EXPECT_FALSE(aResult);
      EXPECT_EQ(tlrxCodeOf([&] { aRead.readXML(path(aCase.mName).c_str(), true); }), 261121);
    }
  }
  // Fields whose value type or shape no rule recognised, in both forms.
  CDescription aOdd;
  auto aSection = std::make_unique<CDescriptionSection>();
  aSection->setName("Sensor");
  aSection->appendField(std::make_unique<CDescriptionField>("Odd", CTLRX_DS_SCALAR, CTLRX_DS_UNRECOGNISED));
  aSection->appendField(std::make_unique<CDescriptionField>("Shape", CTLRX_DS_UNRECOGNISED, CTLRX_DS_DOUBLE));
  aOdd.addSection(std::move(aSection));
  tlrxWriteFile(path("odd.sml"), "<HEADER_INFO><Sensor><Odd>1</Odd></Sensor></HEADER_INFO>");
  tlrxWriteFile(path("odd_hdr"), "[Sensor]\nShape=1\n");
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { aOdd.readXML(path("odd.sml").c_str(), false); }, &aMessage), 848644);
  EXPECT_EQ(aMessage, "Odd");
  EXPECT_EQ(tlrxCodeOf([&] { fdfReadTextSection(*aOdd.getSection(0), path("odd_hdr").c_str()); }, &aMessage), 848644);
  EXPECT_EQ(aMessage, "Shape");
}

TEST_F(DescriptionXmlTest, ReadXmlSectionTakesTheNamedListEntry) {
  const std::string aFile = path("map.xml");
  tlrxWriteFile(aFile, CTLRX_XML_START + "<HEADER_INFO NumberOfElements = \"2\">\n"
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
  for (const char *aText : {"<HEADER_INFO NumberOfElements=\"3\"><SECTION NAME=\"Sensor\"/></HEADER_INFO>", // count
                            "<HEADER_INFO NumberOfElements=\"1\"><SECTION NAME=\"Sens\"/></HEADER_INFO>",   // no entry
                            "<OTHER NumberOfElements=\"1\"><SECTION NAME=\"Sensor\"/></OTHER>"}) {       // root
    tlrxWriteFile(aFile, aText);
    EXPECT_FALSE(fdfReadXMLSection(aSection, aFile.c_str(), true)) << aText;
  }
  tlrxWriteFile(aFile, "<HEADER_INFO NumberOfElements=\"1\"><SECTION NAME=\"Sensor\">");
  EXPECT_FALSE(fdfReadXMLSection(aSection, aFile.c_str(), false));
  EXPECT_EQ(tlrxCodeOf([&] { fdfReadXMLSection(aSection, aFile.c_str(), true); }), 261121);
  // Single sections accept lines of 1,000,000 characters only.
  tlrxWriteFile(aFile, "<HEADER_INFO NumberOfElements=\"1\"><SECTION NAME=\"Sensor\"><Name>" +
                           std::string(CTLRX_XML_SECTION_MAX_LINE, 'n') + "</Name></SECTION></HEADER_INFO>");
  EXPECT_FALSE(fdfReadXMLSection(aSection, aFile.c_str(), false));
}

TEST_F(DescriptionXmlTest, TextFormReadsTheOldFormAndRefusesMissingBlocksAndValues) {
  tlrxWriteFile(path("old_hdr"), "[RasterInfo]\nLines=1\n"
                                 " [ Sensor ]   ; leading blank and blanks inside the brackets\r\n"
                                 "Name=\"two words\"\r\nLines=\t-42 \nGain=-nan\nDoppler={0.5 -1.25e-05   NaN\t3}\n"
                                 "Counts={1 2 3}\nPos={xNaNx 2}\nLabels={\"a b\" \"\" plain \"q\"uote\"}\n"
                                 "Unknown=skipped\nno equal sign here\n[RasterInfo]\nGain=9\n");
  CDescription aDescription;
  declare(aDescription);
  CDescriptionSection &aSection = *aDescription.findSection("Sensor");
  ASSERT_TRUE(fdfReadTextSection(aSection, path("old_hdr").c_str()));
  EXPECT_STREQ(aSection.findField("Name")->getString(), "two words");
  EXPECT_EQ(aSection.findField("Lines")->getInteger(), -42);
  EXPECT_TRUE(std::isnan(aSection.findField("Gain")->getDouble()));
  const CDescriptionField &aDoppler = *aSection.findField("Doppler");
  ASSERT_EQ(aDoppler.getColNbr(), 4);
  const double aDopplers[] = {0.5, -1.25e-05, NAN, 3.0};
  for (int32_t i = 0; i < 4; ++i)
    EXPECT_TRUE(tlrxSameDouble(aDoppler.getDouble(i), aDopplers[i])) << i;
  EXPECT_EQ(aSection.findField("Counts")->getInteger(2), 3);
  EXPECT_TRUE(std::isnan(aSection.findField("Pos")->getMember(0)->getDouble()));
  const CDescriptionField &aLabels = *aSection.findField("Labels");
  ASSERT_EQ(aLabels.getColNbr(), 4);
  const char *const aExpected[] = {"a b", "", "plain", "q\"uote"};
  for (int32_t i = 0; i < 4; ++i)
    EXPECT_STREQ(aLabels.getString(i), aExpected[i]);
  tlrxWriteFile(path("h_hdr"), "  [Sensor]\nLines=1\n[Sensor2]\n");
  EXPECT_FALSE(fdfReadTextSection(aSection, path("h_hdr").c_str())); // "[" in the third character is no header
  EXPECT_FALSE(fdfReadTextSection(aSection, path("absent_hdr").c_str()));
  const std::pair<const char *, const char *> aCases[] = {
      {"Lines=", "Lines"},         {"Name=   ", "Name"}, {"Doppler=1 2", "Doppler"}, {"Grid={{1 2} {3}}", "Grid"},
      {"Orbit={{1 2 3} {4 5}}", "Orbit"}, {"Pos={1}", "Pos"}, {"Counts={1 {2}}", "Counts"},
      // Numbers are read whole, vector elements too; a real takes any text
      // holding "NaN" as NaN, an integer never.
      {"Lines=16e1", "Lines: not an integer: [16e1]"}, {"Lines=NaN", "Lines: not an integer: [NaN]"},
      {"Gain=-3 x", "Gain: not a number: [-3 x]"},     {"Counts={1 2x}", "Counts: not an integer: [2x]"}};
  for (const auto &[aLine, aField] : aCases) {
    tlrxWriteFile(path("m_hdr"), std::string("[Sensor]\n") + aLine + "\n");
    std::string aMessage;
    EXPECT_EQ(tlrxCodeOf([&] { fdfReadTextSection(aSection, path("m_hdr").c_str()); }, &aMessage), 848642) << aLine;
    EXPECT_EQ(aMessage, aField);
  }
  // A line too long for the reader inside the block fails it; elsewhere it is skipped.
  const std::string aLong(CTLRX_TEXT_FORM_MAX_LINE + 1, 'x');
  tlrxWriteFile(path("l_hdr"), "[Other]\n" + aLong + "\n[Sensor]\nLines=5\n");
  ASSERT_TRUE(fdfReadTextSection(aSection, path("l_hdr").c_str()));
  EXPECT_EQ(aSection.findField("Lines")->getInteger(), 5);
  tlrxWriteFile(path("l_hdr"), "[Sensor]\nName=\"" + aLong + "\"\n");
  EXPECT_FALSE(fdfReadTextSection(aSection, path("l_hdr").c_str()));
}

TEST_F(DescriptionXmlTest, TextFormRoundTripsAndWritingABlockKeepsTheOthers) {
  CDescription aDescription, aRead;
  declare(aDescription);
  aDescription.getField("Sensor.Name").setString("x {y} \"z\"");
  aDescription.getField("Sensor.Gain").setDouble(0.1);
  tlrxFill<double>(aDescription.getField("Sensor.Grid"), {-1 / 6.0, -2 / 6.0, -3 / 6.0, 1 / 6.0, 2 / 6.0, 3 / 6.0}, 2);
  tlrxFill<const char *>(aDescription.getField("Sensor.Table"), {"KEY ONE", "}{", "k2", ""}, 2);
  tlrxFillStruct(aDescription, "Sensor.Orbit", {"Sensor.T", "Sensor.X", "Sensor.Y"},
                 {0, 1, 2, DBL_MAX, DBL_MAX / 2, DBL_MAX / 3, -0.0, -DBL_MIN, -DBL_MIN * 2});
  aDescription.getField("Sensor.Lat").setDouble(1.0 / 3);
  aDescription.getField("Sensor.Lon").setDouble(5e-324);
  ASSERT_TRUE(fdfWriteTextSection(*aDescription.findSection("Sensor"), path("rt_hdr").c_str()));
  const std::string aText = tlrxReadFile(path("rt_hdr"));
  EXPECT_EQ(aText.substr(0, aText.find("\nGrid=")), "[Sensor]\nName=\"x {y} \"z\"\"\nGain=0.1");
  EXPECT_NE(aText.find("\nTable={{\"KEY ONE\" \"}{\"} {\"k2\" \"\"}}\n"), std::string::npos) << aText;
  EXPECT_NE(aText.find("\nPos={0.3333333333333333 4.94065645841247e-324}\n"), std::string::npos) << aText;
  declare(aRead);
  ASSERT_TRUE(fdfReadTextSection(*aRead.findSection("Sensor"), path("rt_hdr").c_str()));
  tlrxExpectSameValues(aDescription, aRead);
  // Writing a block keeps the others byte for byte.
  const std::string aBefore = "; hand-written header\n[RasterInfo]\r\nNrOfLinesPerImage=12  \n\n";
  const std::string aAfter = "[Unknown]\nwhatever = {1 2\n";
  tlrxWriteFile(path("k_hdr"), aBefore + "[Sensor]\nLines=1\nName=\"old\"\n" + aAfter);
  aDescription.clear();
  declare(aDescription);
  aDescription.getField("Sensor.Lines").setInteger(2);
  ASSERT_TRUE(fdfWriteTextSection(*aDescription.findSection("Sensor"), path("k_hdr").c_str()));
  EXPECT_EQ(tlrxReadFile(path("k_hdr")), aBefore + "[Sensor]\nLines=2\n" + aAfter);
  // A new block goes to the end, after a last line without line end.
  tlrxWriteFile(path("n_hdr"), "[RasterInfo]\nNrOfLinesPerImage=12");
  ASSERT_TRUE(fdfWriteTextSection(*aDescription.findSection("Sensor"), path("n_hdr").c_str()));
  EXPECT_EQ(tlrxReadFile(path("n_hdr")), "[RasterInfo]\nNrOfLinesPerImage=12\n[Sensor]\nLines=2\n");
  // Reading the whole description from the text form, section by section.
  aRead.clear();
  declare(aRead, {"Sensor", "RasterInfo"});
  ASSERT_TRUE(aRead.readFromFile(path("n").c_str(), true));
  EXPECT_EQ(aRead.getField("RasterInfo.NrOfLinesPerImage").getInteger(), 12);
  EXPECT_EQ(aRead.getField("Sensor.Lines").getInteger(), 2);
  EXPECT_FALSE(aRead.getField("Sensor.Name").holdsValue());
}

TEST(XmlTextSteps, PreprocessingReplacesEntitiesHighBytesAndLatin1Letters) {
  EXPECT_EQ(preprocess("a&quot;&apos;&amp;&lt;&gt;&#38;&amp b"), "a##quot##apos##amp##lt##gt&#38;&amp b");
  // Bytes 128..164: "####BIG" and the byte minus 80; 165 and above pass.
  EXPECT_EQ(preprocess("\x80\x85\xA4\xA5"), "####BIG0####BIG5####BIGT\xA5");
  // Latin-1 letters outside UTF-8 sequences are folded; inside they pass.
  EXPECT_EQ(preprocess("\xE9\xF1\xFC\xB0\xF6"), "enudo");
  // Bytes of a well-formed UTF-8 sequence are never folded nor marked.
  EXPECT_EQ(preprocess("\xC3\xA9 \xC2\xB0 \xE9\x80\x80 \xC4\x8C"), "\xC3\xA9 \xC2\xB0 \xE9\x80\x80 \xC4\x8C");
  // A literal '#' is marked, so that "##amp" survives restoring; a stray 0x8C is no '<'.
  EXPECT_EQ(preprocess("a#b##amp&#38;"), "a##hashb##hash##hashamp&#38;");
  EXPECT_EQ(preprocess("\x86\x8C\x8D"), "####BIG6\x8C####BIG=");
  EXPECT_EQ(preprocess(std::string("a\0b", 3)), std::string("a\0b", 3));
}

TEST(XmlTextSteps, EscapingCoversTheFiveCharactersAndRestoringInvertsThePreprocessing) {
  EXPECT_EQ(escape("<a href=\"x\">'&'</a>\x85"), "&lt;a href=&quot;x&quot;&gt;&apos;&amp;&apos;&lt;/a&gt;\x85");
  EXPECT_EQ(fdfRestoreXmlText("##quot##apos##amp##lt##gt"), "\"'&<>");
  EXPECT_EQ(fdfRestoreXmlText("####BIG5x####BIGT"), "\x85x\xA4");
  EXPECT_EQ(fdfRestoreXmlText("#a##b###amp####BIG"), "#a##b#&####BIG");
  EXPECT_EQ(fdfRestoreXmlText("##hash##hashamp##hash"), "##amp#");
  // Every byte survives the round, but for the Latin-1 letters folded alone.
  const std::string aFolded[][2] = {{"\xE9", "e"}, {"\xF1", "n"}, {"\xFC", "u"}, {"\xB0", "d"}, {"\xF6", "o"}};
  for (int aByte = 1; aByte < 256; ++aByte) {
    std::string aText = std::string("v") + static_cast<char>(aByte) + "&<", aExpected = aText;
    for (const auto &aFold : aFolded)
      if (aText[1] == aFold[0][0])
        aExpected = "v" + aFold[1] + "&<";
    EXPECT_EQ(fdfRestoreXmlText(preprocess(escape(aText.c_str()))), aExpected) << aByte;
  }
}

TEST_F(DescriptionXmlTest, TreeHoldsNamesAttributesTextAndOrder) {
  CXmlElementTree aTree;
  ASSERT_TRUE(parse(aTree, "<?xml version=\"1.0\" ?>\r\n<root a = \"1\" b='x&amp;y'>\r\n"
                           "  <v>one <!-- c --> two</v>\n  <e/>\n  <v>3</v><w>&#233;&#x4E2D;</w>\n</root>"));
  const CXmlElement *aRoot = aTree.getRoot();
  ASSERT_NE(aRoot, nullptr);
  EXPECT_EQ(aRoot->getName(), "root");
  EXPECT_STREQ(aRoot->getAttribute("a"), "1");
  EXPECT_STREQ(aRoot->getAttribute("b"), "x&y"); // attribute values are restored too
  EXPECT_EQ(aRoot->getAttribute("c"), nullptr);
  ASSERT_EQ(aRoot->getChildren().size(), 4u);
  EXPECT_EQ(aRoot->findChild("v")->getText(), "one  two");
  EXPECT_FALSE(aRoot->findChild("e")->hasText());
  EXPECT_EQ(aRoot->getChildren()[2]->getText(), "3");
  EXPECT_EQ(aRoot->findChild("w")->getText(), "\xE9\xE4\xB8\xAD");
  EXPECT_EQ(aRoot->findChild("w")->getDepth(), 1);
  EXPECT_EQ(aTree.getElementCount(), 5u);
  EXPECT_EQ(aTree.getElement(3).getName(), "v");
  EXPECT_EQ(aTree.getElement(3).getIndex(), 3u);
  EXPECT_EQ(aTree.getElement(3).getParent(), aRoot);
}

// Deep nesting neither recurses nor fails; a line limit counts the content only.
TEST_F(DescriptionXmlTest, DeepNestingAndLineLimits) {
  std::string aText;
  const int aDepth = 200000;
  for (int i = 0; i < aDepth; ++i)
    aText += "<a>\n";
  for (int i = 0; i < aDepth; ++i)
    aText += "</a>\n";
  CXmlElementTree aTree;
  ASSERT_TRUE(parse(aTree, aText));
  EXPECT_EQ(aTree.getElementCount(), static_cast<size_t>(aDepth));
  EXPECT_EQ(aTree.getElement(aDepth - 1).getDepth(), aDepth - 1);
  EXPECT_TRUE(parse(aTree, "<a>123456</a>\r\n", 13));
  EXPECT_TRUE(parse(aTree, "<a>123456</a>", 13));
  EXPECT_FALSE(parse(aTree, "<a>1234567</a>\n", 13));
  EXPECT_NE(aTree.getErrorText().find("line longer than 13 characters at line 1"), std::string::npos);
  EXPECT_TRUE(aTree.empty());
  EXPECT_FALSE(parse(aTree, "<a>\n</b>\n"));
  EXPECT_NE(aTree.getErrorText().find("mismatched tag at line 2"), std::string::npos);
  EXPECT_FALSE(aTree.parseFile(path("none.xml").c_str(), 100));
}

TEST(XmlRawLines, LinesKeepEveryByteAndReportOverflow) {
  const std::string aContent = std::string("ab\0c\n", 5) + "0123456789\nlast";
  FILE *aFile = fmemopen(const_cast<char *>(aContent.data()), aContent.size(), "rb");
  ASSERT_NE(aFile, nullptr);
  char aBuffer[8];
  bool aTooLong = true;
  const std::pair<std::string, bool> aLines[] = {{aContent.substr(0, 5), false}, {"0123456", true}, {"last", false}};
  for (const auto &[aLine, aCut] : aLines) {
    EXPECT_EQ(fdfReadRawLine(aFile, aBuffer, sizeof aBuffer, aTooLong), static_cast<long>(aLine.size()));
    EXPECT_EQ(aTooLong, aCut) << aLine;
    EXPECT_EQ(std::string(aBuffer, aLine.size() + 1), aLine + '\0');
  }
  EXPECT_EQ(fdfReadRawLine(aFile, aBuffer, sizeof aBuffer, aTooLong), -1);
  std::fclose(aFile);
}
