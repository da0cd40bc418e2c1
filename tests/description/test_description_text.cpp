// Text form of descriptions ("_hdr"): reading section by section, the value
// forms, and rewriting one block while the others stay byte for byte.
#include "tlrx_description_test_support.h"
#include "tlrx_description_xml.h"

#include <gtest/gtest.h>

#include <cfloat>
#include <cmath>

namespace {

const char *const CTLRX_TEXT_KEYS = R"([Sensor]
Name    = S
Lines   = I
Gain    = D
Doppler = VD
Counts  = VI
Labels  = VS
Grid    = MD
Table   = MS
Orbit   = 3VD T X Y
Pos     = 2D Lat Lon
[RasterInfo]
NrOfLinesPerImage = I
CellType          = S
)";

class DescriptionTextTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }
  void TearDown() override { EXPECT_EQ(fdfScratchBuffersInUse(), 0); }
  void declare(CDescription &theDescription, const std::vector<std::string> &theNames = {"Sensor"}) {
    tlrxDeclare(theDescription, mDir.path(), CTLRX_TEXT_KEYS, theNames);
  }
  std::string path(const char *theName) const { return mDir.file(theName); }
};

} // namespace

TEST_F(DescriptionTextTest, ReadsScalarsAndVectorsOfTheOldForm) {
  tlrxWriteFile(path("old_hdr"), "[RasterInfo]\n"
                                 "Lines=1\n"
                                 " [ Sensor ]   ; leading blank and blanks inside the brackets\r\n"
                                 "Name=\"two words\"\r\n"
                                 "Lines=\t-42 \n"
                                 "Gain=-nan\n"
                                 "Doppler={0.5 -1.25e-05   NaN\t3}\n"
                                 "Counts={1 2 3}\n"
                                 "Labels={\"a b\" \"\" plain \"q\"uote\"}\n"
                                 "Unknown=skipped\n"
                                 "no equal sign here\n"
                                 "[RasterInfo]\n"
                                 "Gain=9\n");
  CDescription aDescription;
  declare(aDescription);
  CDescriptionSection &aSection = *aDescription.findSection("Sensor");
  ASSERT_TRUE(fdfReadTextSection(aSection, path("old_hdr").c_str()));
  EXPECT_STREQ(aSection.findField("Name")->getString(), "two words");
  EXPECT_EQ(aSection.findField("Lines")->getInteger(), -42);
  EXPECT_TRUE(std::isnan(aSection.findField("Gain")->getDouble()));
  const CDescriptionField &aDoppler = *aSection.findField("Doppler");
  ASSERT_EQ(aDoppler.getColNbr(), 4);
  EXPECT_EQ(aDoppler.getDouble(0), 0.5);
  EXPECT_EQ(aDoppler.getDouble(1), -1.25e-05);
  EXPECT_TRUE(std::isnan(aDoppler.getDouble(2)));
  EXPECT_EQ(aDoppler.getDouble(3), 3.0);
  EXPECT_EQ(aSection.findField("Counts")->getInteger(2), 3);
  const CDescriptionField &aLabels = *aSection.findField("Labels");
  ASSERT_EQ(aLabels.getColNbr(), 4);
  EXPECT_STREQ(aLabels.getString(0), "a b");
  EXPECT_STREQ(aLabels.getString(1), "");
  EXPECT_STREQ(aLabels.getString(2), "plain");
  EXPECT_STREQ(aLabels.getString(3), "q\"uote");
}

TEST_F(DescriptionTextTest, MissingBlocksAndValues) {
  tlrxWriteFile(path("h_hdr"), "  [Sensor]\nLines=1\n[Sensor2]\n");
  CDescription aDescription;
  declare(aDescription);
  CDescriptionSection &aSection = *aDescription.findSection("Sensor");
  // "[" in the third character is no header.
  EXPECT_FALSE(fdfReadTextSection(aSection, path("h_hdr").c_str()));
  EXPECT_FALSE(fdfReadTextSection(aSection, path("absent_hdr").c_str()));
  const std::pair<const char *, const char *> aCases[] = {
      {"Lines=", "Lines"}, {"Name=   ", "Name"}, {"Doppler=1 2", "Doppler"},
      {"Grid={{1 2} {3}}", "Grid"}, {"Orbit={{1 2 3} {4 5}}", "Orbit"}, {"Pos={1}", "Pos"},
      {"Counts={1 {2}}", "Counts"},
  };
  for (const auto &[aLine, aField] : aCases) {
    SCOPED_TRACE(aLine);
    tlrxWriteFile(path("m_hdr"), std::string("[Sensor]\n") + aLine + "\n");
    std::string aMessage;
    EXPECT_EQ(tlrxCodeOf([&] { fdfReadTextSection(aSection, path("m_hdr").c_str()); }, &aMessage), 848642);
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

TEST_F(DescriptionTextTest, MatricesAndStructsRoundTrip) {
  CDescription aDescription;
  declare(aDescription);
  auto aField = [&aDescription](const char *theKey) -> CDescriptionField & { return aDescription.getField(theKey); };
  aField("Sensor.Name").setString("x {y} \"z\"");
  aField("Sensor.Gain").setDouble(0.1);
  CDescriptionField &aGrid = aField("Sensor.Grid");
  aGrid.allocate(2, 3);
  for (int r = 0; r < 2; ++r)
    for (int c = 0; c < 3; ++c)
      aGrid.setDouble(r, c, (r - 0.5) * (c + 1) / 3.0);
  CDescriptionField &aTable = aField("Sensor.Table");
  aTable.allocate(2, 2);
  aTable.setString(0, 0, "KEY ONE");
  aTable.setString(0, 1, "}{");
  aTable.setString(1, 0, "k2");
  aTable.setString(1, 1, "");
  aField("Sensor.Orbit").setNumberOfElements(3);
  for (int i = 0; i < 3; ++i) {
    aField("Sensor.T").setDouble(i, i);
    aField("Sensor.X").setDouble(i, DBL_MAX / (i + 1));
    aField("Sensor.Y").setDouble(i, -DBL_MIN * i);
  }
  aField("Sensor.Lat").setDouble(1.0 / 3);
  aField("Sensor.Lon").setDouble(5e-324);
  ASSERT_TRUE(fdfWriteTextSection(*aDescription.findSection("Sensor"), path("rt_hdr").c_str()));
  const std::string aText = tlrxReadFile(path("rt_hdr"));
  EXPECT_EQ(aText.substr(0, aText.find("\nGrid=")), "[Sensor]\nName=\"x {y} \"z\"\"\nGain=0.1");
  EXPECT_NE(aText.find("\nTable={{\"KEY ONE\" \"}{\"} {\"k2\" \"\"}}\n"), std::string::npos) << aText;
  EXPECT_NE(aText.find("\nPos={0.3333333333333333 4.94065645841247e-324}\n"), std::string::npos) << aText;

  CDescription aRead;
  declare(aRead);
  ASSERT_TRUE(fdfReadTextSection(*aRead.findSection("Sensor"), path("rt_hdr").c_str()));
  tlrxExpectSameValues(aDescription, aRead);
}

TEST_F(DescriptionTextTest, WritingKeepsTheOtherBlocksByteForByte) {
  const std::string aBefore = "; hand-written header\n[RasterInfo]\r\nNrOfLinesPerImage=12  \n\n";
  const std::string aAfter = "[Unknown]\nwhatever = {1 2\n";
  tlrxWriteFile(path("k_hdr"), aBefore + "[Sensor]\nLines=1\nName=\"old\"\n" + aAfter);
  CDescription aDescription;
  declare(aDescription);
  aDescription.getField("Sensor.Lines").setInteger(2);
  ASSERT_TRUE(fdfWriteTextSection(*aDescription.findSection("Sensor"), path("k_hdr").c_str()));
  EXPECT_EQ(tlrxReadFile(path("k_hdr")), aBefore + "[Sensor]\nLines=2\n" + aAfter);
  // A new block goes to the end, after a last line without line end.
  tlrxWriteFile(path("n_hdr"), "[RasterInfo]\nNrOfLinesPerImage=12");
  ASSERT_TRUE(fdfWriteTextSection(*aDescription.findSection("Sensor"), path("n_hdr").c_str()));
  EXPECT_EQ(tlrxReadFile(path("n_hdr")), "[RasterInfo]\nNrOfLinesPerImage=12\n[Sensor]\nLines=2\n");
  // Reading the whole description from the text form, section by section.
  CDescription aRead;
  declare(aRead, {"Sensor", "RasterInfo"});
  ASSERT_TRUE(aRead.readFromFile(path("n").c_str(), true));
  EXPECT_EQ(aRead.getField("RasterInfo.NrOfLinesPerImage").getInteger(), 12);
  EXPECT_EQ(aRead.getField("Sensor.Lines").getInteger(), 2);
  EXPECT_FALSE(aRead.getField("Sensor.Name").holdsValue());
}

TEST_F(DescriptionTextTest, FieldsOfUnusableShapeRaise) {
  CDescription aDescription;
  auto aSection = std::make_unique<CDescriptionSection>();
  aSection->setName("Sensor");
  aSection->appendField(std::make_unique<CDescriptionField>("Odd", CTLRX_DS_UNRECOGNISED, CTLRX_DS_DOUBLE));
  aDescription.addSection(std::move(aSection));
  tlrxWriteFile(path("u_hdr"), "[Sensor]\nOdd=1\n");
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { fdfReadTextSection(*aDescription.findSection("Sensor"), path("u_hdr").c_str()); },
                       &aMessage),
            848644);
  EXPECT_EQ(aMessage, "Odd");
}
