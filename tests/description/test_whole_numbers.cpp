// Numbers of headers, argument and parameter files are read whole: the
// runtime's two parsers, and the XML and text forms of a header refusing a
// number with junk instead of reading its first digits.
#include "tlrx_description_test_support.h"
#include "tlrx_description_xml.h"
#include "tlrx_generic_utility.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>

namespace {

constexpr double sInf = std::numeric_limits<double>::infinity();

struct SIntegerCase {
  const char *mText;
  bool mRead;
  int32_t mValue;
};

struct SRealCase {
  const char *mText;
  bool mFinite;
  bool mRead;
  double mValue;
};

const char *const CTLRX_NUMBER_KEYS = R"([RasterInfo]
NrOfPixelsPerLine = I
NullCellValue     = D
Offsets           = VI
)";

class HeaderNumbersTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }

  // Writes the header of raster "img" with one field holding theText, in the
  // XML form (".sml") or the text form ("_hdr").
  std::string writeHeader(const std::string &theField, const std::string &theText, bool theXml) {
    const std::string aRaster = mDir.file("img");
    std::remove((aRaster + ".sml").c_str());
    std::remove((aRaster + "_hdr").c_str());
    if (theXml)
      tlrxWriteFile(aRaster + ".sml", "<?xml version=\"1.0\" ?>\n<HEADER_INFO>\n<RasterInfo>\n<" + theField + ">" +
                                          theText + "</" + theField + ">\n</RasterInfo>\n</HEADER_INFO>\n");
    else
      tlrxWriteFile(aRaster + "_hdr", "[RasterInfo]\n" + theField + "=" + theText + "\n");
    return aRaster;
  }
  // The code and message of reading the header of "img".
  int32_t read(CDescription &theHeader, std::string &theMessage) {
    theHeader.clear();
    tlrxDeclare(theHeader, mDir.path(), CTLRX_NUMBER_KEYS, {"RasterInfo"});
    theMessage.clear();
    return tlrxCodeOf([&] { EXPECT_TRUE(theHeader.readFromFile(mDir.file("img").c_str(), true)); }, &theMessage);
  }
};

} // namespace

TEST(WholeNumbers, IntegersAreTheWholeTextWithinInt32) {
  const SIntegerCase aCases[] = {
      {"30", true, 30},          {"  -12\t", true, -12},       {"+7", true, 7},
      {"2147483647", true, INT32_MAX}, {"-2147483648", true, INT32_MIN}, {"007\r\n", true, 7},
      {"30 junk", false, 0},     {"16e1", false, 0},           {"7abc", false, 0},
      {"7.9", false, 0},         {"4294967303", false, 0},     {"2147483648", false, 0},
      {"-2147483649", false, 0}, {"99999999999999999999", false, 0}, {"", false, 0},
      {"   ", false, 0},         {"garbage", false, 0},        {"0x10", false, 0},
      {"- 5", false, 0},         {"\v5", false, 0},            {"5 5", false, 0},
  };
  for (const SIntegerCase &aCase : aCases) {
    int32_t aValue = -77;
    EXPECT_EQ(fdfParseWholeInteger(aCase.mText, aValue), aCase.mRead) << "[" << aCase.mText << "]";
    EXPECT_EQ(aValue, aCase.mRead ? aCase.mValue : -77) << "[" << aCase.mText << "] left untouched when refused";
  }
  int32_t aValue = 0;
  EXPECT_FALSE(fdfParseWholeInteger(nullptr, aValue));
}

TEST(WholeNumbers, RealsAreTheWholeTextWithoutOverflow) {
  const SRealCase aCases[] = {
      {"0.25", true, true, 0.25},     {" -1e3 ", true, true, -1000.0}, {"16e1", true, true, 160.0},
      {"1e-400", true, true, 0.0},    {"inf", false, true, sInf},    {"-Infinity", false, true, -sInf},
      {"inf", true, false, 0},        {"nan", true, false, 0},         {"1e999", false, false, 0},
      {"-1e999", false, false, 0},    {"0.3x", true, false, 0},        {"garbage", false, false, 0},
      {"", false, false, 0},          {" ", false, false, 0},          {"1 2", false, false, 0},
      {"1,5", false, false, 0},
  };
  for (const SRealCase &aCase : aCases) {
    double aValue = -77.0;
    EXPECT_EQ(fdfParseWholeDouble(aCase.mText, aValue, aCase.mFinite), aCase.mRead)
        << "[" << aCase.mText << "] finite " << aCase.mFinite;
    EXPECT_EQ(aValue, aCase.mRead ? aCase.mValue : -77.0) << "[" << aCase.mText << "]";
  }
}

TEST_F(HeaderNumbersTest, BothHeaderFormsRefuseNumbersWithJunkNamingTheField) {
  struct SCase {
    const char *mField;
    const char *mText;
    const char *mMessage;
  } const aCases[] = {
      {"NrOfPixelsPerLine", "30 junk", "NrOfPixelsPerLine: not an integer: [30 junk]"},
      {"NrOfPixelsPerLine", "16e1", "NrOfPixelsPerLine: not an integer: [16e1]"},
      {"NrOfPixelsPerLine", "4294967303", "NrOfPixelsPerLine: not an integer: [4294967303]"},
      {"NrOfPixelsPerLine", "7.9", "NrOfPixelsPerLine: not an integer: [7.9]"},
      {"NullCellValue", "garbage", "NullCellValue: not a number: [garbage]"},
      {"NullCellValue", "1e999", "NullCellValue: not a number: [1e999]"},
      {"NullCellValue", "-3 x", "NullCellValue: not a number: [-3 x]"},
  };
  for (bool aXml : {true, false}) {
    for (const SCase &aCase : aCases) {
      writeHeader(aCase.mField, aCase.mText, aXml);
      CDescription aHeader;
      std::string aMessage;
      EXPECT_EQ(read(aHeader, aMessage), CTLRX_ERR_DS_FIELD_MISSING) << aCase.mText << " xml " << aXml;
      EXPECT_EQ(aMessage, aCase.mMessage) << "xml " << aXml;
    }
    // Vector elements too.
    if (aXml)
      tlrxWriteFile(mDir.file("img.sml"), "<HEADER_INFO><RasterInfo><Offsets><VectorInteger NumberOfElements=\"2\">"
                                          "<ValueInteger>1</ValueInteger><ValueInteger>2x</ValueInteger>"
                                          "</VectorInteger></Offsets></RasterInfo></HEADER_INFO>\n");
    else
      writeHeader("Offsets", "{1 2x}", false);
    CDescription aHeader;
    std::string aMessage;
    EXPECT_EQ(read(aHeader, aMessage), CTLRX_ERR_DS_FIELD_MISSING);
    EXPECT_EQ(aMessage, "Offsets: not an integer: [2x]");
  }
}

TEST_F(HeaderNumbersTest, WholeNumbersBlanksAndStoredNaNsStillRead) {
  struct SCase {
    const char *mField;
    const char *mText;
    double mValue; // NaN for NaN
  } const aCases[] = {
      {"NrOfPixelsPerLine", " 30 ", 30},   {"NrOfPixelsPerLine", "-4", -4},  {"NullCellValue", "-9999", -9999},
      {"NullCellValue", "1.5e2", 150},     {"NullCellValue", "NaN", NAN},    {"NullCellValue", "-NaN", NAN},
      {"NullCellValue", "nan(0x8)", NAN},  {"NullCellValue", "xNaNx", NAN},
  };
  for (bool aXml : {true, false}) {
    for (const SCase &aCase : aCases) {
      writeHeader(aCase.mField, aCase.mText, aXml);
      CDescription aHeader;
      std::string aMessage;
      ASSERT_EQ(read(aHeader, aMessage), 0) << aCase.mText << " " << aMessage;
      const CDescriptionField &aField = aHeader.getField((std::string("RasterInfo.") + aCase.mField).c_str());
      const double aGot = aField.getValueType() == CTLRX_DS_INTEGER ? aField.getInteger() : aField.getDouble();
      if (std::isnan(aCase.mValue))
        EXPECT_TRUE(std::isnan(aGot)) << aCase.mText;
      else
        EXPECT_EQ(aGot, aCase.mValue) << aCase.mText << " xml " << aXml;
    }
  }
}
