// The texture step program on small rasters: pixel by pixel against a direct
// window computation, edge cases and its errors. Speckle statistics on
// simulated scenes are in the process tests.
#include "texture.h"
#include "tlrx_description_xml.h"
#include "tlrx_standard_header.h"
#include "tlrx_window_step_support.h"

#include <cmath>
#include <limits>
#include <random>

namespace {

constexpr double sNull = -9999.0;

class TextureStepTest : public WindowStepTest {
protected:
  std::vector<double> texture(const std::string &theInput, int theRows, int theCols,
                              const std::string &theOutput = "tex") {
    EXPECT_EQ(run(::texture, {file(theInput), file(theOutput), "0", std::to_string(theRows),
                              std::to_string(theCols)}),
              0);
    return tlrxReadTestRaster(file(theOutput));
  }
};

// 7 x 9 with no-data pixels on corners, edges, the first column and inside.
STestImage smallImage(uint64_t theSeed, double theLow, double theHigh) {
  STestImage aImage;
  aImage.mLines = 7;
  aImage.mPixels = 9;
  std::mt19937_64 aEngine(theSeed);
  std::uniform_real_distribution<double> aValue(theLow, theHigh);
  for (int i = 0; i < 63; ++i) {
    aImage.mValues.push_back(aValue(aEngine));
    aImage.mValid.push_back(1);
  }
  for (int aNoData : {0, 8, 9, 18, 22, 31, 32, 40, 54, 62})
    aImage.mValid[aNoData] = 0;
  return aImage;
}

} // namespace

TEST_F(TextureStepTest, MatchesDirectWindowsOddEvenAndLargerThanTheImage) {
  const STestImage aImage = smallImage(3, 0.5, 30.0);
  write("amp", aImage, "AMPLITUDE");
  write("pwr", aImage, "POWER");
  const std::pair<int, int> aWindows[] = {{3, 3}, {4, 3}, {3, 4}, {5, 7}, {6, 8}, {7, 9}, {9, 11}, {12, 20}};
  for (const auto &aWindow : aWindows) {
    const std::string aWhat = std::to_string(aWindow.first) + " x " + std::to_string(aWindow.second);
    expectMatches(texture("amp", aWindow.first, aWindow.second),
                  refTexture(aImage, false, aWindow.first, aWindow.second, sNull), sNull, "amplitude " + aWhat);
    expectMatches(texture("pwr", aWindow.first, aWindow.second),
                  refTexture(aImage, true, aWindow.first, aWindow.second, sNull), sNull, "power " + aWhat);
  }
}

TEST_F(TextureStepTest, ResultHeaderIsAFloatNumberRasterWithTheDummyValue) {
  STestImage aImage = smallImage(5, 1.0, 2.0);
  write("in", aImage, "AMPLITUDE", -1.0, "05-MAR-2004 09:30:15.500000");
  texture("in", 3, 3);
  CDescription aHeader;
  fdfReadStandardHeader(file("tex").c_str(), aHeader);
  EXPECT_STREQ(aHeader.getField("RasterInfo.CellType").getString(), "FLOAT");
  EXPECT_STREQ(aHeader.getField("RasterInfo.DataUnits").getString(), "NUMBER");
  EXPECT_EQ(aHeader.getField("RasterInfo.NullCellValue").getDouble(), sNull);
  EXPECT_EQ(aHeader.getField("RasterInfo.NrOfLinesPerImage").getInteger(), 7);
  EXPECT_EQ(aHeader.getField("RasterInfo.NrOfPixelsPerLine").getInteger(), 9);
  EXPECT_EQ(aHeader.getField("RasterInfo.HeaderOffset").getInteger(), 0);
  // The rest of the input header is kept.
  EXPECT_NE(tlrxReadFile(file("tex.sml")).find("05-MAR-2004 09:30:15.500000"), std::string::npos);
}

TEST_F(TextureStepTest, ConstantImageGivesZeroExceptAtNoData) {
  STestImage aImage = constantImage(12, 15, 5.0);
  // A 4 x 4 hole: its inner pixels have no valid pixel in a 3 x 3 window.
  for (int l = 4; l < 8; ++l)
    for (int j = 5; j < 9; ++j)
      aImage.mValid[static_cast<size_t>(l) * 15 + j] = 0;
  write("five", aImage, "AMPLITUDE");
  const std::vector<double> aOut = texture("five", 3, 3);
  for (int l = 0; l < 12; ++l)
    for (int j = 0; j < 15; ++j)
      EXPECT_EQ(aOut[static_cast<size_t>(l) * 15 + j], aImage.valid(l, j) ? 0.0 : sNull) << l << ", " << j;
  // A value with no exact binary form in the largest window: 0, never NaN.
  write("tenth", constantImage(40, 600, 0.1), "AMPLITUDE");
  for (double aValue : texture("tenth", 500, 500)) {
    ASSERT_FALSE(std::isnan(aValue));
    EXPECT_NEAR(aValue, 0.0, 1e-6);
  }
}

TEST_F(TextureStepTest, ZeroWindowAndInvalidCentreGiveTheNullValue) {
  STestImage aImage = constantImage(5, 5, 0.0);
  aImage.mValues[12] = 3.0;    // centre pixel 3, everything else 0
  aImage.mValid[6] = 0;        // invalid pixel next to it
  write("z", aImage, "AMPLITUDE", -1.0);
  const std::vector<double> aOut = texture("z", 3, 3);
  EXPECT_EQ(aOut[0], sNull);  // window all zeros: no division by a zero mean
  EXPECT_EQ(aOut[6], sNull);  // itself invalid although its window holds 3
  EXPECT_NE(aOut[12], sNull); // holds the 3
}

// Guards the NaN fault: a NaN cell (with a numeric null value) must stay out
// of the running sums, or every later window of its line and every later
// line would be NaN.
TEST_F(TextureStepTest, NaNCellCountsAsNoData) {
  STestImage aImage = smallImage(9, 1.0, 4.0);
  aImage.mValues[20] = std::numeric_limits<double>::quiet_NaN();
  write("nan", aImage, "AMPLITUDE");
  expectMatches(texture("nan", 3, 3), refTexture(aImage, false, 3, 3, sNull), sNull, "NaN cell");
}

// Guards the copied scale factor: the result's values are written unscaled,
// so its header must not carry the input's factor.
TEST_F(TextureStepTest, InputScaleFactorIsNotCopiedToTheResult) {
  STestImage aImage = smallImage(4, 1.0, 9.0);
  write("s", aImage, "AMPLITUDE");
  CDescription aHeader;
  fdfReadStandardHeader(file("s").c_str(), aHeader);
  aHeader.getField("RasterInfo.RealScaleFactor").setDouble(3.0);
  ASSERT_TRUE(fdfWriteStandardHeader(file("s").c_str(), aHeader));
  // The coefficient of variation does not change with the scale.
  expectMatches(texture("s", 3, 5), refTexture(aImage, false, 3, 5, sNull), sNull, "scaled input");
}

TEST_F(TextureStepTest, ErrorsAndTheirCodes) {
  write("in", constantImage(4, 4, 1.0), "AMPLITUDE");
  std::string aMessage;
  EXPECT_EQ(tlrxRaisedCode([&] { run(::texture, {file("in"), file("o"), "0", "3"}); }, &aMessage), 783360);
  EXPECT_EQ(aMessage, "");
  EXPECT_EQ(tlrxRaisedCode([&] { run(::texture, {file("in"), file("o"), "0", "2", "5"}); }), 456961);
  EXPECT_EQ(tlrxRaisedCode([&] { run(::texture, {file("in"), file("o"), "0", "5", "501"}); }), 456961);
  // Window tokens are read whole: none of these is a window of 7.
  const std::pair<const char *, const char *> aBadWindows[] = {
      {"7abc", "window rows: not an integer [7abc]"},        {"7.9", "window rows: not an integer [7.9]"},
      {"4294967303", "window rows: not an integer [4294967303]"}, {"", "window rows: not an integer []"},
      {"7 7", "window rows: not an integer [7 7]"},
  };
  for (const auto &aBad : aBadWindows) {
    EXPECT_EQ(tlrxRaisedCode([&] { run(::texture, {file("in"), file("o"), "0", aBad.first, "3"}); }, &aMessage), 456961);
    EXPECT_EQ(aMessage, aBad.second);
  }
  EXPECT_EQ(tlrxRaisedCode([&] { run(::texture, {file("in"), file("o"), "0", " 3 ", "3x"}); }, &aMessage), 456961);
  EXPECT_EQ(aMessage, "window columns: not an integer [3x]");
  EXPECT_FALSE(tlrxFileExists(file("o")));
  EXPECT_EQ(tlrxRaisedCode([&] { run(::texture, {file("none"), file("o"), "0", "3", "3"}); }, &aMessage), 261122);
  EXPECT_EQ(aMessage, file("none_hdr"));
  EXPECT_FALSE(tlrxFileExists(file("o")));
  // A data file shorter than its header declares.
  tlrxWriteFile(file("in"), std::string(4 * 4 * 2, '\0'));
  EXPECT_EQ(tlrxRaisedCode([&] { run(::texture, {file("in"), file("o"), "0", "3", "3"}); }), 261125);
}

// An image with fewer lines (and pixels) than the window is computed with
// the clipped windows rather than refused.
TEST_F(TextureStepTest, ImageSmallerThanTheWindowUsesClippedWindows) {
  STestImage aImage = smallImage(12, 1.0, 5.0);
  aImage.mLines = 2;
  aImage.mValues.resize(18);
  aImage.mValid.resize(18);
  write("two", aImage, "AMPLITUDE");
  expectMatches(texture("two", 5, 21), refTexture(aImage, false, 5, 21, sNull), sNull, "2 lines");
}

// The line loop sends progress, and the host's interruption stops it there.
TEST_F(TextureStepTest, HostInterruptionDuringTheLinesStopsTheStep) {
  write("in", constantImage(50, 4, 1.0), "AMPLITUDE");
  tlrxWriteFile(file("Process.working"), "101\nhost\n");
  EXPECT_EQ(tlrxRaisedCode([&] { run(::texture, {file("in"), file("o"), "0", "3", "3"}); }), 326400);
  tlrxWriteFile(file("Process.working"), "0\nhost\n");
  texture("in", 3, 3);
  EXPECT_EQ(tlrxReadLines(file("Process.working"))[0], "97"); // 2 + int(97 x 49 / 50)
}
