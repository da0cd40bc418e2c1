// The normalisation and intensity coherence step programs on small rasters:
// pixel by pixel against direct window computations, speckle invariants,
// headers, the closing operation and the errors. Pairs of known coherence
// from the scene simulator are in the process tests.
#include "normalize_images.h"
#include "quick_and_dirty.h"
#include "tlrx_description_xml.h"
#include "tlrx_standard_header.h"
#include "tlrx_window_step.h"
#include "tlrx_window_step_support.h"

#include <cmath>
#include <complex>
#include <random>

namespace {

constexpr double sNull = -9999.0; // program-wide dummy value of the test configuration
constexpr double sNormNull = -5.0; // dummy value given to the normalisation

class CorrelationStepTest : public WindowStepTest {
protected:
  // Normalisation then coherence of inputs theA and theB into "coh".
  std::vector<double> coherence(const std::string &theA, const std::string &theB, int theNormRows, int theNormCols,
                                int theRows, int theCols) {
    EXPECT_EQ(run(normalize_images, {file(theA), file(theB), file("norm"), std::to_string(sNormNull),
                                     std::to_string(theNormRows), std::to_string(theNormCols)}),
              0);
    EXPECT_EQ(run(quick_and_dirty, {file(theA), file(theB), file("norm"), file("coh"), "0",
                                    std::to_string(theRows), std::to_string(theCols)}),
              0);
    return tlrxReadTestRaster(file("coh"));
  }

  // The normalisation image as the coherence step reads it.
  STestImage normImage(int theLines, int thePixels) const {
    STestImage aNorm;
    aNorm.mLines = theLines;
    aNorm.mPixels = thePixels;
    aNorm.mValues = tlrxReadTestRaster(file("norm"));
    for (double aValue : aNorm.mValues)
      aNorm.mValid.push_back(aValue != sNormNull ? 1 : 0);
    return aNorm;
  }
};

STestImage randomImage(int theLines, int thePixels, uint64_t theSeed, const std::vector<int> &theNoData) {
  STestImage aImage = constantImage(theLines, thePixels, 0.0);
  std::mt19937_64 aEngine(theSeed);
  std::uniform_real_distribution<double> aValue(0.2, 6.0);
  for (double &aCell : aImage.mValues)
    aCell = aValue(aEngine);
  for (int aIndex : theNoData)
    aImage.mValid[aIndex] = 0;
  return aImage;
}

// A pair of single-look intensity images of coherence theGamma.
void speckledPair(int theLines, int thePixels, double theGamma, uint64_t theSeed, STestImage &theA,
                  STestImage &theB) {
  CTestSpeckle aSpeckle(theSeed);
  theA = constantImage(theLines, thePixels, 0.0);
  theB = theA;
  for (size_t i = 0; i < theA.mValues.size(); ++i)
    aSpeckle.pair(theGamma, theA.mValues[i], theB.mValues[i]);
}

} // namespace

TEST_F(CorrelationStepTest, BothStepsMatchDirectWindowsWithNoDataOddAndEvenWindows) {
  // 7 x 9; no-data in one input only, in both, on the first column and corners.
  const STestImage aA = randomImage(7, 9, 1, {0, 9, 22, 40, 62});
  const STestImage aB = randomImage(7, 9, 2, {8, 18, 22, 31, 54});
  write("a", aA, "AMPLITUDE");
  write("b", aB, "POWER");
  const std::pair<int, int> aWindows[] = {{3, 3}, {4, 5}, {5, 4}, {7, 9}, {10, 12}};
  for (const auto &aNormWindow : aWindows)
    for (const auto &aWindow : aWindows) {
      const std::string aWhat = std::to_string(aNormWindow.first) + "x" + std::to_string(aNormWindow.second) +
                                " then " + std::to_string(aWindow.first) + "x" + std::to_string(aWindow.second);
      const std::vector<double> aCoherence =
          coherence("a", "b", aNormWindow.first, aNormWindow.second, aWindow.first, aWindow.second);
      expectMatches(tlrxReadTestRaster(file("norm")),
                    refNormalize(aA, false, aB, true, aNormWindow.first, aNormWindow.second, sNormNull),
                    sNormNull, "normalisation " + aWhat);
      // The reference reads the normalisation as written (float).
      expectMatches(aCoherence,
                    refCoherence(aA, false, aB, true, normImage(7, 9), aWindow.first, aWindow.second, sNull),
                    sNull, "coherence " + aWhat);
    }
}

TEST_F(CorrelationStepTest, IdenticalConstantImagesGiveOne) {
  write("four", constantImage(6, 8, 4.0), "POWER");
  write("two", constantImage(6, 8, 2.0), "AMPLITUDE"); // intensity 4 as well
  const std::vector<double> aOut = coherence("four", "two", 3, 3, 3, 3);
  for (double aValue : tlrxReadTestRaster(file("norm")))
    EXPECT_EQ(aValue, 4.0);
  for (double aValue : aOut)
    EXPECT_EQ(aValue, 1.0);
}

// Guards the one-sided no-data fault: squares summed over pixels missing
// from the other image pulled r below 1 for identical images.
TEST_F(CorrelationStepTest, IdenticalSpeckleImagesGiveOneWhateverTheirNoData) {
  STestImage aA, aB;
  speckledPair(30, 40, 0.5, 5, aA, aB);
  STestImage aHoles = aA;
  for (int i = 0; i < 1200; i += 7)
    aHoles.mValid[i] = 0;
  write("a", aA, "POWER");
  write("h", aHoles, "POWER");
  const std::vector<double> aOut = coherence("a", "h", 5, 5, 7, 7);
  for (size_t i = 0; i < aOut.size(); ++i) {
    if (aHoles.mValid[i] == 0)
      EXPECT_EQ(aOut[i], sNull) << i;
    else
      EXPECT_NEAR(aOut[i], 1.0, 1e-6) << i;
  }
}

TEST_F(CorrelationStepTest, IndependentImagesGiveRNearOneHalfAndManyExactZeros) {
  const int aLines = 120, aPixels = 150;
  STestImage aA, aB;
  speckledPair(aLines, aPixels, 0.0, 77, aA, aB);
  write("a", aA, "POWER");
  write("b", aB, "POWER");
  const std::vector<double> aOut = coherence("a", "b", 11, 11, 11, 11);
  long aZeros = 0;
  for (double aValue : aOut)
    aZeros += aValue == 0.0 ? 1 : 0;
  // r is spread about 0.5: close to half the pixels are cut to exactly 0.
  EXPECT_GT(aZeros, static_cast<long>(aOut.size() * 0.35));
  EXPECT_LT(aZeros, static_cast<long>(aOut.size() * 0.65));
  EXPECT_LT(tlrxInteriorMean(aOut, aLines, aPixels, 10), 0.2);
}

// A block of zeros in a constant image, and one after bright pixels. Guards
// the residue fault: running sums left about 1e-16 of the bright values in
// the block, so its normalisation was not 0 and its coherence 0.8 to 0.95.
TEST_F(CorrelationStepTest, ZeroNormalisationMakesThePixelNoData) {
  for (const double aHigh : {3.0, 1e5}) {
    // Lines 3 .. 8, columns 20 .. 31 of a 9 x 32 amplitude image are 0.
    STestImage aImage = randomImage(9, 32, 3, {});
    for (size_t i = 0; i < aImage.mValues.size(); ++i) {
      const bool aBlock = i / 32 >= 3 && i % 32 >= 20;
      aImage.mValues[i] = aBlock ? 0.0 : aHigh == 3.0 ? 3.0 : aImage.mValues[i] * aHigh;
    }
    write("c", aImage, "AMPLITUDE", -1.0);
    write("d", aImage, "AMPLITUDE", -1.0);
    const std::vector<double> aOut = coherence("c", "d", 3, 3, 3, 3);
    const std::vector<double> aNorm = tlrxReadTestRaster(file("norm"));
    for (int l = 4; l < 8; ++l)
      for (int j = 21; j < 31; ++j) {
        const size_t i = static_cast<size_t>(l) * 32 + j;
        EXPECT_EQ(aNorm[i], 0.0) << aHigh << " at " << l << ", " << j;
        EXPECT_EQ(aOut[i], sNull) << aHigh << " at " << l << ", " << j;
      }
    EXPECT_NEAR(aOut[0], 1.0, 1e-6) << aHigh;
  }
}

TEST_F(CorrelationStepTest, HeadersOfTheNormalisationAndTheCoherence) {
  write("a", constantImage(4, 4, 2.0), "AMPLITUDE", -1.0, "05-MAR-2004 09:30:15.500000");
  write("b", constantImage(4, 4, 2.0), "AMPLITUDE", -1.0, "17-MAR-2004 10:00:00.000000");
  coherence("a", "b", 3, 3, 3, 3);
  CDescription aNorm, aCoherence;
  fdfReadStandardHeader(file("norm").c_str(), aNorm);
  fdfReadStandardHeader(file("coh").c_str(), aCoherence);
  EXPECT_STREQ(aNorm.getField("RasterInfo.CellType").getString(), "FLOAT");
  EXPECT_EQ(aNorm.getField("RasterInfo.NullCellValue").getDouble(), sNormNull);
  EXPECT_STREQ(aCoherence.getField("RasterInfo.CellType").getString(), "FLOAT");
  EXPECT_STREQ(aCoherence.getField("RasterInfo.DataUnits").getString(), "COHERENCE");
  EXPECT_EQ(aCoherence.getField("RasterInfo.NullCellValue").getDouble(), sNull);
  const CDescriptionField &aFiles = aCoherence.getField("RasterInfo.FilesList");
  ASSERT_EQ(aFiles.getNumberOfElements(), 2);
  EXPECT_EQ(std::string(aFiles.getString(0)), file("a"));
  EXPECT_EQ(std::string(aFiles.getString(1)), file("b"));
  const std::string aXml = tlrxReadFile(file("coh.sml"));
  for (const char *aText : {"MASTER ACQUISITION TIME", "SLAVE ACQUISITION TIME", "05-MAR-2004 09:30:15.500000",
                            "17-MAR-2004 10:00:00.000000"})
    EXPECT_NE(aXml.find(aText), std::string::npos) << aText;
}

TEST_F(CorrelationStepTest, ClosingRemovesTheNormalisationImage) {
  write("a", constantImage(4, 4, 2.0), "AMPLITUDE");
  coherence("a", "a", 3, 3, 3, 3);
  ASSERT_TRUE(tlrxFileExists(file("norm")));
  ASSERT_TRUE(tlrxFileExists(file("norm.sml")));
  run(quick_and_dirty_close, {file("a"), file("a"), file("norm"), file("coh"), "0", "3", "3"});
  EXPECT_FALSE(tlrxFileExists(file("norm")));
  EXPECT_FALSE(tlrxFileExists(file("norm.sml")));
  EXPECT_FALSE(tlrxFileExists(file("norm.hdr")));
  EXPECT_TRUE(tlrxFileExists(file("coh")));
  EXPECT_TRUE(tlrxFileExists(file("a")));
}

TEST_F(CorrelationStepTest, ErrorsAndTheirCodes) {
  write("a", constantImage(4, 5, 2.0), "AMPLITUDE");
  write("b", constantImage(4, 5, 2.0), "AMPLITUDE");
  write("tall", constantImage(5, 5, 2.0), "AMPLITUDE");
  write("wide", constantImage(4, 6, 2.0), "AMPLITUDE");
  auto aNormalize = [&](const std::vector<std::string> &theArgs) {
    return tlrxRaisedCode([&] { run(normalize_images, theArgs); });
  };
  auto aCorrelate = [&](const std::vector<std::string> &theArgs) {
    return tlrxRaisedCode([&] { run(quick_and_dirty, theArgs); });
  };
  const std::string a = file("a"), b = file("b"), n = file("norm"), o = file("o");
  EXPECT_EQ(aNormalize({a, b, n, "0", "3"}), 783360);
  EXPECT_EQ(aCorrelate({a, b, n, o, "0", "3"}), 783360);
  EXPECT_EQ(aNormalize({a, b, n, "0", "3", "501"}), 456961);
  EXPECT_EQ(aNormalize({a, b, n, "0", "2", "3"}), 456961);
  EXPECT_EQ(aCorrelate({a, b, n, o, "0", "3", "501"}), 456961);
  EXPECT_EQ(aNormalize({a, file("tall"), n, "0", "3", "3"}), 652807);
  EXPECT_EQ(aNormalize({a, file("wide"), n, "0", "3", "3"}), 652807);
  std::string aMessage;
  EXPECT_EQ(tlrxRaisedCode([&] { run(normalize_images, {a, file("x"), n, "0", "3", "3"}); }, &aMessage), 261122);
  EXPECT_EQ(aMessage, file("x_hdr"));
  // The coherence step checks the normalisation image too.
  EXPECT_EQ(aCorrelate({a, b, file("missing"), o, "0", "3", "3"}), 261122);
  EXPECT_EQ(aCorrelate({a, b, file("wide"), o, "0", "3", "3"}), 652807);
  EXPECT_EQ(aCorrelate({a, file("tall"), a, o, "0", "3", "3"}), 652807);
  // Number tokens are read whole; the dummy value of the normalisation is a
  // parameter error, a window a window error, each naming its token.
  struct SBadToken {
    bool mNormalize;
    std::vector<std::string> mArgs;
    int32_t mCode;
    const char *mMessage;
  } const aBadTokens[] = {
      {true, {a, b, n, "-9999x", "3", "3"}, 456960, "dummy value: not a number [-9999x]"},
      {true, {a, b, n, "inf", "3", "3"}, 456960, "dummy value: not a number [inf]"},
      {true, {a, b, n, "0", "5abc", "3"}, 456961, "window rows: not an integer [5abc]"},
      {true, {a, b, n, "0", "3", "4294967299"}, 456961, "window columns: not an integer [4294967299]"},
      {false, {a, b, n, o, "0", "3.5", "3"}, 456961, "window rows: not an integer [3.5]"},
      {false, {a, b, n, o, "0", "3", "3 junk"}, 456961, "window columns: not an integer [3 junk]"},
  };
  for (const SBadToken &aBad : aBadTokens) {
    EXPECT_EQ(tlrxRaisedCode([&] { run(aBad.mNormalize ? normalize_images : quick_and_dirty, aBad.mArgs); }, &aMessage),
              aBad.mCode)
        << aBad.mMessage;
    EXPECT_EQ(aMessage, aBad.mMessage);
  }
  EXPECT_FALSE(tlrxFileExists(n));
  EXPECT_FALSE(tlrxFileExists(o));
}

// A complex input asked for its parts gives the cells (a coherence step sums
// them), no data only where both parts are the null value.
TEST_F(CorrelationStepTest, ComplexInputGivesItsPartsWithNoData) {
  STestImage aParts = constantImage(2, 6, 0.0);
  aParts.mValues = {1, 2, -1, -1, -1, 5, 3, -4, 0.5, 0.25, -1, -1};
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
  for (int l = 0; l < 2; ++l) {
    aInput.readLine(l);
    for (int j = 0; j < 3; ++j) {
      EXPECT_EQ(aInput.mask()[j], aValid[l][j]) << l << ", " << j;
      if (aValid[l][j] != 0)
        EXPECT_EQ(aInput.cells()[j], aWant[l][j]) << l << ", " << j;
    }
  }
}
