// The normalisation and coherence step programs against direct window
// computations, speckle invariants, headers, closing and errors.
#include "normalize_images.h"
#include "quick_and_dirty.h"
#include "tlrx_header_expect.h"
#include "tlrx_trace_test_support.h"
#include "tlrx_window_step.h"
#include "tlrx_window_step_support.h"

#include <complex>
#include <random>

namespace {

constexpr double sNull = -9999.0;  // program-wide dummy value of the test configuration
constexpr double sNormNull = -5.0; // dummy value given to the normalisation

class CorrelationStepTest : public WindowStepTest {
protected:
  // Normalisation then coherence of inputs theA and theB into "coh".
  std::vector<double> coherence(const std::string &theA, const std::string &theB, int theNormRows, int theNormCols,
                                int theRows, int theCols) {
    EXPECT_EQ(run(normalize_images, {file(theA), file(theB), file("norm"), std::to_string(sNormNull),
                                     std::to_string(theNormRows), std::to_string(theNormCols)}),
              0);
    EXPECT_EQ(run(quick_and_dirty, {file(theA), file(theB), file("norm"), file("coh"), "0", std::to_string(theRows),
                                    std::to_string(theCols)}),
              0);
    return tlrxReadTestRaster(file("coh"));
  }
};

} // namespace

TEST_F(CorrelationStepTest, BothStepsMatchDirectWindowsWithNoDataOddAndEvenWindows) {
  // 7 x 9; no-data in one input only, in both, on the first column and corners.
  const STestImage aA = randomImage(7, 9, 1, 0.2, 6.0, {0, 9, 22, 40, 62});
  const STestImage aB = randomImage(7, 9, 2, 0.2, 6.0, {8, 18, 22, 31, 54});
  write("a", aA, "AMPLITUDE");
  write("b", aB, "POWER");
  const std::pair<int, int> aWindows[] = {{3, 3}, {4, 5}, {5, 4}, {7, 9}, {10, 12}};
  for (const auto &aNormWindow : aWindows)
    for (const auto &aWindow : aWindows) {
      const std::string aWhat = std::to_string(aNormWindow.first) + "x" + std::to_string(aNormWindow.second) +
                                " then " + std::to_string(aWindow.first) + "x" + std::to_string(aWindow.second);
      const std::vector<double> aCoherence =
          coherence("a", "b", aNormWindow.first, aNormWindow.second, aWindow.first, aWindow.second);
      // The reference reads the normalisation as written (float).
      STestImage aNorm{7, 9, tlrxReadTestRaster(file("norm")), {}};
      for (double aValue : aNorm.mValues)
        aNorm.mValid.push_back(aValue != sNormNull ? 1 : 0);
      expectMatches(aNorm.mValues, refNormalize(aA, false, aB, true, aNormWindow.first, aNormWindow.second, sNormNull),
                    sNormNull, "normalisation " + aWhat);
      expectMatches(aCoherence, refCoherence(aA, false, aB, true, aNorm, aWindow.first, aWindow.second, sNull), sNull,
                    "coherence " + aWhat);
    }
}

// 1, 2 and 3 threads write the same normalisation and coherence bytes and
// trace the same counts, which are those of the direct windows: an odd image
// of several bands with a last block cut short, windows of R odd and even.
TEST_F(CorrelationStepTest, ThreadsWriteTheSameBytesAndCountsAsOneThread) {
  STestImage aA = randomImage(467, 37, 4, 0.2, 6.0, {0, 40, 3000, 3001, 17000});
  STestImage aB = randomImage(467, 37, 5, 0.2, 6.0, {1, 40, 9000, 17278});
  // As the float rasters hold them: near g = 0 the square root magnifies any
  // difference of the inputs some thousandfold.
  for (STestImage *aImage : {&aA, &aB})
    for (double &aValue : aImage->mValues)
      aValue = static_cast<float>(aValue);
  write("a", aA, "AMPLITUDE");
  write("b", aB, "POWER");
  for (const auto &aWindows : {std::vector<int>{5, 3, 7, 5}, std::vector<int>{4, 6, 6, 4}}) {
    const std::string aWhat = std::to_string(aWindows[2]) + " x " + std::to_string(aWindows[3]);
    std::vector<std::string> aTraces;
    expectSameBytesForThreads(
        [&] {
          ASSERT_TRUE(tlrxStartTrace());
          coherence("a", "b", aWindows[0], aWindows[1], aWindows[2], aWindows[3]);
          aTraces.push_back(tlrxStopTrace(mDir.path()));
        },
        {file("norm"), file("coh")}, aWhat);
    for (const std::string &aTrace : aTraces)
      EXPECT_EQ(aTrace, aTraces[0]) << aWhat;
    STestImage aNorm{467, 37, tlrxReadTestRaster(file("norm")), {}};
    int64_t aNormCount = 0;
    for (double aValue : aNorm.mValues) {
      aNorm.mValid.push_back(aValue != sNormNull ? 1 : 0);
      aNormCount += aValue != sNormNull ? 1 : 0;
    }
    const std::vector<double> aWant = refCoherence(aA, false, aB, true, aNorm, aWindows[2], aWindows[3], sNull);
    expectMatches(tlrxReadTestRaster(file("coh")), aWant, sNull, aWhat);
    const int64_t aComputed = std::count_if(aWant.begin(), aWant.end(), [](double v) { return v != sNull; });
    const int64_t aAbove08 = std::count_if(aWant.begin(), aWant.end(), [](double v) { return v > 0.8; });
    EXPECT_TRUE(tlrxContains(aTraces[0], "Number of significant value (no equal to -5 one) = " +
                                             std::to_string(aNormCount)))
        << aWhat;
    EXPECT_TRUE(tlrxContains(aTraces[0], "Number  =" + std::to_string(aComputed) +
                                             "\nNumber of  >0.8 =" + std::to_string(aAbove08) + "\n"))
        << aWhat << "\n" << aTraces[0];
  }
}

// Guards the one-sided no-data fault: squares summed over pixels missing
// from the other image pulled r below 1 for identical images.
TEST_F(CorrelationStepTest, IdenticalImagesGiveOneWhateverTheirNoDataAndZeroNormalisationIsNoData) {
  std::mt19937_64 aEngine(5);
  std::exponential_distribution<double> aSpeckle(1.0); // single-look intensities
  STestImage aA = constantImage(30, 40, 0.0);
  for (double &aValue : aA.mValues)
    aValue = aSpeckle(aEngine);
  STestImage aHoles = aA;
  for (int i = 0; i < 1200; i += 7)
    aHoles.mValid[i] = 0;
  write("a", aA, "POWER");
  write("h", aHoles, "POWER");
  const std::vector<double> aSame = coherence("a", "h", 5, 5, 7, 7);
  for (size_t i = 0; i < aSame.size(); ++i) {
    if (aHoles.mValid[i] == 0)
      EXPECT_EQ(aSame[i], sNull) << i;
    else
      EXPECT_NEAR(aSame[i], 1.0, 1e-6) << i;
  }
  // A block of zeros in a constant image, and one after bright pixels. Guards
  // the residue fault: running sums left about 1e-16 of the bright values in
  // the block, so its normalisation was not 0 and its coherence 0.8 to 0.95.
  for (const double aHigh : {3.0, 1e5}) {
    // Lines 3 .. 8, columns 20 .. 31 of a 9 x 32 amplitude image are 0.
    STestImage aImage = randomImage(9, 32, 3, 0.2, 6.0, {});
    for (size_t i = 0; i < aImage.mValues.size(); ++i)
      aImage.mValues[i] = i / 32 >= 3 && i % 32 >= 20 ? 0.0 : aHigh == 3.0 ? 3.0 : aImage.mValues[i] * aHigh;
    write("c", aImage, "AMPLITUDE");
    write("d", aImage, "AMPLITUDE");
    const std::vector<double> aOut = coherence("c", "d", 3, 3, 3, 3);
    const std::vector<double> aNorm = tlrxReadTestRaster(file("norm"));
    for (int l = 4; l < 8; ++l)
      for (int j = 21; j < 31; ++j) {
        EXPECT_EQ(aNorm[l * 32 + j], 0.0) << aHigh << " at " << l << ", " << j;
        EXPECT_EQ(aOut[l * 32 + j], sNull) << aHigh << " at " << l << ", " << j;
      }
    EXPECT_NEAR(aOut[0], 1.0, 1e-6) << aHigh;
  }
}

TEST_F(CorrelationStepTest, HeadersOfTheNormalisationAndTheCoherenceAndTheClosingRemovesTheFormer) {
  write("a", constantImage(4, 4, 2.0), "AMPLITUDE", -1.0, "05-MAR-2004 09:30:15.500000");
  write("b", constantImage(4, 4, 2.0), "AMPLITUDE", -1.0, "17-MAR-2004 10:00:00.000000");
  coherence("a", "b", 3, 3, 3, 3);
  tlrxExpectHeader(file("norm"), "CellType=FLOAT;NullCellValue=-5");
  tlrxExpectHeader(file("coh"), "CellType=FLOAT;DataUnits=COHERENCE;NullCellValue=-9999;FilesList=" + file("a") +
                                    "," + file("b"));
  EXPECT_EQ(tlrxOtherInfo(file("coh"), "MASTER ACQUISITION TIME"), "05-MAR-2004 09:30:15.500000");
  EXPECT_EQ(tlrxOtherInfo(file("coh"), "SLAVE ACQUISITION TIME"), "17-MAR-2004 10:00:00.000000");
  run(quick_and_dirty_close, {file("a"), file("b"), file("norm"), file("coh"), "0", "3", "3"});
  for (const char *aName : {"norm", "norm.sml", "norm.hdr"})
    EXPECT_FALSE(tlrxFileExists(file(aName))) << aName;
  EXPECT_TRUE(tlrxFileExists(file("coh")) && tlrxFileExists(file("a")));
}

TEST_F(CorrelationStepTest, ErrorsAndTheirCodes) {
  write("a", constantImage(4, 5, 2.0), "AMPLITUDE");
  write("b", constantImage(4, 5, 2.0), "AMPLITUDE");
  write("tall", constantImage(5, 5, 2.0), "AMPLITUDE");
  write("wide", constantImage(4, 6, 2.0), "AMPLITUDE");
  const std::string a = file("a"), b = file("b"), n = file("norm"), o = file("o"), t = file("tall"), w = file("wide");
  // Number tokens are read whole; the dummy value of the normalisation is a
  // parameter error, a window a window error, each naming its token. The
  // coherence step checks the normalisation image too.
  const struct {
    bool mNormalize;
    std::vector<std::string> mArgs;
    int32_t mCode;
    std::string mMessage;
  } aCases[] = {
      {true, {a, b, n, "0", "3"}, 783360, ""},
      {false, {a, b, n, o, "0", "3"}, 783360, ""},
      {true, {a, b, n, "0", "2", "3"}, 456961, ""},
      {false, {a, b, n, o, "0", "3", "501"}, 456961, ""},
      {true, {a, t, n, "0", "3", "3"}, 652807, ""},
      {true, {a, w, n, "0", "3", "3"}, 652807, ""},
      {false, {a, b, w, o, "0", "3", "3"}, 652807, ""},
      {false, {a, t, a, o, "0", "3", "3"}, 652807, ""},
      {true, {a, b, n, "-9999x", "3", "3"}, 456960, "dummy value: not a number [-9999x]"},
      {true, {a, b, n, "inf", "3", "3"}, 456960, "dummy value: not a number [inf]"},
      {true, {a, b, n, "0", "5abc", "3"}, 456961, "window rows: not an integer [5abc]"},
      {true, {a, b, n, "0", "3", "4294967299"}, 456961, "window columns: not an integer [4294967299]"},
      {false, {a, b, n, o, "0", "3.5", "3"}, 456961, "window rows: not an integer [3.5]"},
      {false, {a, b, n, o, "0", "3", "3 junk"}, 456961, "window columns: not an integer [3 junk]"},
  };
  for (const auto &aCase : aCases) {
    std::string aMessage;
    EXPECT_EQ(raised(aCase.mNormalize ? normalize_images : quick_and_dirty, aCase.mArgs, &aMessage), aCase.mCode)
        << aCase.mArgs[aCase.mArgs.size() - 2] << " " << aCase.mArgs.back() << " " << aCase.mMessage;
    if (aCase.mCode != 652807)
      EXPECT_EQ(aMessage, aCase.mMessage);
  }
  EXPECT_FALSE(tlrxFileExists(n));
  EXPECT_FALSE(tlrxFileExists(o));
}

// A complex input asked for its parts gives the cells (a coherence step sums
// them), no data only where both parts are the null value.
TEST_F(CorrelationStepTest, ComplexInputGivesItsPartsWithNoData) {
  const STestImage aParts{2, 6, {1, 2, -1, -1, -1, 5, 3, -4, 0.5, 0.25, -1, -1}, std::vector<int>(12, 1)};
  write("z", aParts, "AMPLITUDE", -1.0);
  CDescription aHeader;
  fdfReadStandardHeader(file("z").c_str(), aHeader);
  aHeader.getField("RasterInfo.CellType").setString("FLOAT_COMPLEX");
  aHeader.getField("RasterInfo.NrOfPixelsPerLine").setInteger(3);
  ASSERT_TRUE(fdfWriteStandardHeader(file("z").c_str(), aHeader));
  CWindowInput aInput(file("z").c_str());
  aInput.readParts();
  aInput.open();
  const std::complex<double> aWant[2][3] = {{{1, 2}, {-1, -1}, {-1, 5}}, {{3, -4}, {0.5, 0.25}, {-1, -1}}};
  const int32_t aValid[2][3] = {{1, 0, 1}, {1, 1, 0}};
  // The second band keeps line 1 of the first.
  for (const std::pair<int, int> &aBand : {std::pair<int, int>{0, 2}, {1, 1}}) {
    aInput.readBand(aBand.first, aBand.second);
    for (int l = aBand.first; l < aBand.first + aBand.second; ++l)
      for (int j = 0; j < 3; ++j) {
        EXPECT_EQ(aInput.mask(l)[j], aValid[l][j]) << l << ", " << j;
        if (aValid[l][j] != 0)
          EXPECT_EQ(aInput.cells(l)[j], aWant[l][j]) << l << ", " << j;
      }
  }
  // A line outside the band held is the caller's fault, named.
  std::string aMessage;
  EXPECT_EQ(tlrxRaisedCode([&] { aInput.mask(0); }, &aMessage), 913920);
  EXPECT_NE(aMessage.find("line 0 asked of the band of lines 1 .. 1"), std::string::npos) << aMessage;
}
