// The texture step program against a direct window computation: its header,
// errors and the host's interruption.
#include "texture.h"
#include "tlrx_header_expect.h"
#include "tlrx_window_step_support.h"

#include <limits>

namespace {

constexpr double sNull = -9999.0;

class TextureStepTest : public WindowStepTest {
protected:
  std::vector<double> texture(const std::string &theInput, int theRows, int theCols) {
    EXPECT_EQ(run(::texture, {file(theInput), file("tex"), "0", std::to_string(theRows), std::to_string(theCols)}), 0);
    return tlrxReadTestRaster(file("tex"));
  }
};

} // namespace

// Windows odd, even and larger than the image. Guards the NaN fault: a NaN
// cell (with a numeric null value) must stay out of the running sums, or
// every later window of its line and every later line would be NaN. Guards
// the copied scale factor: the result is written unscaled, so its header must
// not carry the input's factor (the coefficient of variation ignores it).
TEST_F(TextureStepTest, MatchesDirectWindowsOddEvenAndLargerThanTheImageWithItsHeader) {
  STestImage aImage = randomImage(7, 9, 3, 0.5, 30.0, sevenByNineNoData());
  aImage.mValues[20] = std::numeric_limits<double>::quiet_NaN();
  write("amp", aImage, "AMPLITUDE");
  write("pwr", aImage, "POWER", -1.0, "05-MAR-2004 09:30:15.500000");
  CDescription aHeader;
  fdfReadStandardHeader(file("amp").c_str(), aHeader);
  aHeader.getField("RasterInfo.RealScaleFactor").setDouble(3.0);
  ASSERT_TRUE(fdfWriteStandardHeader(file("amp").c_str(), aHeader));
  const std::pair<int, int> aWindows[] = {{3, 3}, {4, 3}, {3, 4}, {5, 7}, {6, 8}, {7, 9}, {9, 11}, {12, 20}};
  for (const auto &aWindow : aWindows) {
    const std::string aWhat = std::to_string(aWindow.first) + " x " + std::to_string(aWindow.second);
    expectMatches(texture("amp", aWindow.first, aWindow.second),
                  refTexture(aImage, false, aWindow.first, aWindow.second, sNull), sNull, "amplitude " + aWhat);
    expectMatches(texture("pwr", aWindow.first, aWindow.second),
                  refTexture(aImage, true, aWindow.first, aWindow.second, sNull), sNull, "power " + aWhat);
  }
  // The result is a float number raster with the dummy value; the rest of
  // the input header is kept.
  tlrxExpectHeader(file("tex"), "CellType=FLOAT;DataUnits=NUMBER;NullCellValue=-9999;NrOfLinesPerImage=7;"
                                "NrOfPixelsPerLine=9;HeaderOffset=0");
  EXPECT_EQ(tlrxOtherInfo(file("tex"), "ACQUISITION TIME"), "05-MAR-2004 09:30:15.500000");
}

TEST_F(TextureStepTest, ErrorsAndTheirCodes) {
  write("in", constantImage(4, 4, 1.0), "AMPLITUDE");
  const std::string aIn = file("in"), aOut = file("o");
  // Window tokens are read whole, blanks around them aside.
  const struct {
    std::vector<std::string> mArgs;
    int32_t mCode;
    std::string mMessage;
  } aCases[] = {
      {{aIn, aOut, "0", "3"}, 783360, ""},
      {{aIn, aOut, "0", "2", "5"}, 456961, ""},
      {{aIn, aOut, "0", "7abc", "3"}, 456961, "window rows: not an integer [7abc]"},
      {{aIn, aOut, "0", " 3 ", "3x"}, 456961, "window columns: not an integer [3x]"},
  };
  for (const auto &aCase : aCases) {
    std::string aMessage;
    EXPECT_EQ(raised(::texture, aCase.mArgs, &aMessage), aCase.mCode) << aCase.mMessage;
    EXPECT_EQ(aMessage, aCase.mMessage);
  }
  EXPECT_FALSE(tlrxFileExists(aOut));
}

// The line loop sends progress, and the host's interruption stops it there,
// whatever the threads.
TEST_F(TextureStepTest, HostInterruptionDuringTheLinesStopsTheStep) {
  write("in", constantImage(50, 4, 1.0), "AMPLITUDE");
  for (const int aThreads : CTLRX_TEST_THREADS) {
    const CTestThreads aSetting(aThreads);
    resetWorking("101");
    EXPECT_EQ(raised(::texture, {file("in"), file("o"), "0", "3", "3"}), 326400) << aThreads;
    EXPECT_FALSE(tlrxFileExists(file("o"))) << aThreads;
    resetWorking();
    texture("in", 3, 3);
    EXPECT_EQ(tlrxReadLines(working())[0], "97") << aThreads; // 2 + int(97 x 49 / 50)
  }
}

// 1, 2 and 3 threads write the same bytes: an odd image long enough for
// several bands of blocks (a last one cut short) with no data, windows of R
// odd, even and taller than a block of small windows; the values are those of
// direct windows.
TEST_F(TextureStepTest, ThreadsWriteTheSameBytesAsOneThread) {
  STestImage aImage = randomImage(601, 37, 9, 0.5, 30.0, {0, 36, 37, 5000, 5001, 22236});
  aImage.mValues[300 * 37 + 5] = std::numeric_limits<double>::quiet_NaN();
  write("amp", aImage, "AMPLITUDE");
  const std::pair<int, int> aWindows[] = {{5, 7}, {4, 3}, {67, 5}};
  for (const auto &aWindow : aWindows) {
    const std::string aWhat = std::to_string(aWindow.first) + " x " + std::to_string(aWindow.second);
    const std::vector<std::string> aArgs = {file("amp"), file("tex"), "0", std::to_string(aWindow.first),
                                            std::to_string(aWindow.second)};
    expectSameBytesForThreads([&] { EXPECT_EQ(run(::texture, aArgs), 0); }, {file("tex")}, aWhat);
    CTestThreads aSetting(3);
    expectMatches(texture("amp", aWindow.first, aWindow.second),
                  refTexture(aImage, false, aWindow.first, aWindow.second, sNull), sNull, aWhat);
  }
}
