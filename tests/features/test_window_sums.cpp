// The window machinery on plain buffers: row-window running sums, the ring
// with its line schedule, and the per-line formulas, against direct sums.
#include "tlrx_command_test_support.h"
#include "tlrx_slc_test_support.h"
#include "tlrx_threads.h"
#include "tlrx_window_measures.h"
#include "tlrx_window_reference.h"
#include "tlrx_window_step.h"
#include "tlrx_window_sums.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <numeric>
#include <random>
#include <stdexcept>

namespace {

constexpr double sNaN = std::numeric_limits<double>::quiet_NaN();

// Channel pointers of theStore split into theChannels rows of thePixels.
std::vector<double *> channels(std::vector<double> &theStore, int theChannels, int thePixels) {
  theStore.assign(static_cast<size_t>(theChannels) * thePixels, 0.0);
  std::vector<double *> aOut;
  for (int c = 0; c < theChannels; ++c)
    aOut.push_back(&theStore[static_cast<size_t>(c) * thePixels]);
  return aOut;
}

// Terms of image line theLine into theRing: the value and a count of 1 where
// the pixel is valid, 0 elsewhere, and its centre flags.
void loadImageLine(CWindowRing &theRing, const STestImage &theImage, int32_t theLine) {
  for (int x = 0; x < theImage.mPixels; ++x) {
    const bool aValid = theImage.valid(theLine, x);
    theRing.terms(0)[x] = aValid ? theImage.at(theLine, x) : 0.0;
    theRing.terms(1)[x] = aValid ? 1.0 : 0.0;
    theRing.centre(theLine)[x] = aValid ? 1 : 0;
  }
}

// What a ring shows at output line theLine: both channels' sums and the
// centre flags, as bytes (a -0.0 for a 0.0 is a difference too).
void recordLine(const CWindowRing &theRing, uint8_t *theCentre, std::vector<uint8_t> &theBytes) {
  const size_t aPixels = static_cast<size_t>(theRing.pixels());
  for (int c = 0; c < 2; ++c) {
    const auto *aSums = reinterpret_cast<const uint8_t *>(theRing.column(c));
    theBytes.insert(theBytes.end(), aSums, aSums + aPixels * sizeof(double));
  }
  theBytes.insert(theBytes.end(), theCentre, theCentre + aPixels);
}

// The image through one ring from line 0, line by line.
std::vector<uint8_t> wholeRun(const SWindowShape &theShape, const STestImage &theImage) {
  CWindowRing aRing(theShape, theImage.mLines, theImage.mPixels, 2);
  std::vector<uint8_t> aBytes;
  fdfRunWindowSchedule(
      aRing, [&](int32_t l) { loadImageLine(aRing, theImage, l); },
      [&](int32_t l) { recordLine(aRing, aRing.centre(l), aBytes); });
  return aBytes;
}

// A 23 x 11 image with no data and a 1e20 spike (running sums lose the ones
// beside it until the next recomputation: a block start off the grid shows).
STestImage spikyImage(int theLines) {
  STestImage aImage = randomImage(theLines, 11, 13, 0.5, 20.0, {0, 12, 30, 31, 57, 100, 140});
  aImage.mValues[5 * 11 + 4] = 1e20;
  return aImage;
}

// Window shapes of both rules, R odd and even, one taller than the image.
const SWindowShape sShapes[] = {{3, 3, ETLRXWindowBorder::kClipped}, {4, 5, ETLRXWindowBorder::kClipped},
                                {6, 2, ETLRXWindowBorder::kClipped}, {30, 3, ETLRXWindowBorder::kClipped},
                                {2, 3, ETLRXWindowBorder::kNull},    {5, 4, ETLRXWindowBorder::kNull},
                                {8, 3, ETLRXWindowBorder::kNull}};

std::string shapeName(const SWindowShape &theShape) {
  return std::to_string(theShape.mRows) + " x " + std::to_string(theShape.mCols) +
         (theShape.mBorder == ETLRXWindowBorder::kClipped ? " clipped" : " exact");
}

} // namespace

// Every width (odd: both rules; even: the exact rule), the window starting
// width / 2 columns left of j, with the count of non-zero terms beside.
TEST(RowWindowSum, MatchesDirectSumsForEveryWidthAndLength) {
  std::mt19937_64 aEngine(7);
  std::uniform_real_distribution<double> aValue(-3.0, 11.0);
  for (int aPixels = 1; aPixels <= 13; ++aPixels) {
    std::vector<double> aTerms(aPixels);
    for (double &aTerm : aTerms)
      aTerm = aEngine() % 4 == 0 ? 0.0 : aValue(aEngine);
    for (int aWidth = 1; aWidth <= 31; ++aWidth) {
      const int aLeft = aWidth / 2;
      std::vector<double> aSums(aPixels, sNaN);
      std::vector<int32_t> aNonZero(aPixels, -1);
      fdfRowWindowSum(aTerms.data(), aPixels, aLeft, aWidth, aSums.data(), aNonZero.data());
      for (int j = 0; j < aPixels; ++j) {
        double aWant = 0;
        int aWantNonZero = 0;
        for (int k = std::max(0, j - aLeft); k <= std::min(aPixels - 1, j - aLeft + aWidth - 1); ++k) {
          aWant += aTerms[k];
          aWantNonZero += aTerms[k] != 0.0 ? 1 : 0;
        }
        EXPECT_NEAR(aSums[j], aWant, 1e-12) << "P " << aPixels << " width " << aWidth << " column " << j;
        EXPECT_EQ(aNonZero[j], aWantNonZero) << "P " << aPixels << " width " << aWidth << " column " << j;
      }
    }
  }
}

// A 7 x 9 image through rings of both border rules, windows odd, even and
// larger than the image: lines loaded and emitted once, in order; sums and
// centre flags as direct; exact windows leave R/2 lines and K/2 columns null.
TEST(WindowSchedule, AccumulatorsEqualDirectWindowSums) {
  const STestImage aImage = randomImage(7, 9, 11, 0.5, 20.0, sevenByNineNoData());
  const struct {
    ETLRXWindowBorder mBorder;
    std::vector<int> mRows, mCols;
  } aRules[] = {{ETLRXWindowBorder::kClipped, {1, 2, 3, 4, 5, 6, 7, 8, 9, 14, 15}, {1, 2, 3, 4, 5, 8, 9, 17, 18}},
                {ETLRXWindowBorder::kNull, {2, 3, 4, 5, 7, 8}, {2, 3, 4, 6, 9, 10}}};
  for (const auto &aRule : aRules)
    for (int aRows : aRule.mRows)
      for (int aCols : aRule.mCols) {
        SCOPED_TRACE("R " + std::to_string(aRows) + " K " + std::to_string(aCols));
        CWindowRing aRing({aRows, aCols, aRule.mBorder}, aImage.mLines, aImage.mPixels, 2);
        std::vector<int> aLoaded;
        int aEmitted = 0;
        auto aLoad = [&](int32_t theLine) {
          aLoaded.push_back(theLine);
          for (int x = 0; x < aImage.mPixels; ++x) {
            const bool aValid = aImage.valid(theLine, x);
            aRing.terms(0)[x] = aValid ? aImage.at(theLine, x) : 0.0;
            aRing.terms(1)[x] = aValid ? 1.0 : 0.0;
            aRing.centre(theLine)[x] = aValid ? 1 : 0;
          }
        };
        auto aEmit = [&](int32_t l) {
          ASSERT_EQ(l, aEmitted++);
          for (int j = 0; j < aImage.mPixels; ++j) {
            double aSum = 0, aCount = 0;
            auto aVisit = [&](int y, int x) {
              aSum += aImage.valid(y, x) ? aImage.at(y, x) : 0.0;
              aCount += aImage.valid(y, x) ? 1 : 0;
            };
            bool aInside = true;
            if (aRule.mBorder == ETLRXWindowBorder::kClipped)
              refForWindow(aImage.mLines, aImage.mPixels, aRows, aCols, l, j, aVisit);
            else
              aInside = refForExactWindow(aImage.mLines, aImage.mPixels, aRows, aCols, l, j, aVisit);
            EXPECT_EQ(aRing.centre(l)[j], aInside && aImage.valid(l, j) ? 1 : 0) << l << ", " << j;
            if (aInside) {
              EXPECT_NEAR(aRing.column(0)[j], aSum, 1e-9) << l << ", " << j;
              EXPECT_EQ(aRing.column(1)[j], aCount) << l << ", " << j;
            }
          }
        };
        fdfRunWindowSchedule(aRing, aLoad, aEmit);
        EXPECT_EQ(aEmitted, aImage.mLines);
        EXPECT_EQ(aLoaded, std::vector<int>({0, 1, 2, 3, 4, 5, 6}));
      }
}

// Guards the residue fault: next to a 1e20 spike the running sums lose the
// ones, and kept the loss after the spike had left. Sums are recomputed from
// the stored terms at columns that are multiples of the window width and at
// lines that are multiples of the window height: exact from there on.
TEST(WindowSums, SpikeLeavesNoResidueFromTheFirstRecomputation) {
  for (int aSize : {3, 4, 5}) {
    for (int aSpike : {0, 5, 9}) {
      const int aHalf = aSize / 2, aWidth = 2 * aHalf + 1;
      std::vector<double> aTerms(40, 1.0), aSums(40);
      std::vector<int32_t> aNonZero(40);
      aTerms[aSpike] = 1e20;
      fdfRowWindowSum(aTerms.data(), 40, aHalf, aWidth, aSums.data(), aNonZero.data());
      const int aLeft = aSpike + aHalf + 1; // first column whose window misses it
      for (int j = (aLeft + aWidth - 1) / aWidth * aWidth; j < 40; ++j)
        EXPECT_EQ(aSums[j], std::min(39, j + aHalf) - std::max(0, j - aHalf) + 1.0) << aSize << " column " << j;
      // The same spike in a column of ones, through the ring and its schedule:
      // line l sees lines l + R/2 - R + 1 .. l + R/2.
      CWindowRing aRing({aSize, 1, ETLRXWindowBorder::kClipped}, 40, 2, 1);
      const int aGone = aSpike + aSize - aHalf; // first line whose window misses it
      fdfRunWindowSchedule(
          aRing, [&](int32_t theLine) { aRing.terms(0)[0] = aRing.terms(0)[1] = theLine == aSpike ? 1e20 : 1.0; },
          [&](int32_t theLine) {
            if (theLine >= (aGone + aSize - 1) / aSize * aSize)
              EXPECT_EQ(aRing.column(0)[1], std::min(39, theLine + aHalf) - (theLine + aHalf - aSize + 1) + 1.0)
                  << aSize << " line " << theLine;
          });
    }
  }
}

// Clipped windows take 3 .. 500 (456961), exact windows from 2 (456962).
TEST(WindowSize, LimitsAndCodesOfEachRule) {
  const SWindowRule &aClipped = CTLRX_CLIPPED_WINDOW_RULE, &aExact = CTLRX_EXACT_WINDOW_RULE;
  const struct {
    const SWindowRule &mRule;
    int32_t mRows, mCols, mCode;
  } aCases[] = {{aClipped, 3, 3, 0},      {aClipped, 4, 500, 0},      {aClipped, 2, 5, 456961},
                {aClipped, 501, 5, 456961}, {aClipped, 5, 2, 456961}, {aClipped, 3, 501, 456961},
                {aClipped, 0, 0, 456961}, {aClipped, -3, 7, 456961},  {aExact, 2, 2, 0},
                {aExact, 1, 5, 456962},   {aExact, 5, 1, 456962}};
  for (const auto &aCase : aCases) {
    std::string aMessage;
    EXPECT_EQ(tlrxRaisedCode([&] { fdfCheckWindowSize(aCase.mRows, aCase.mCols, aCase.mRule); }, &aMessage),
              aCase.mCode)
        << aCase.mRows << " x " << aCase.mCols;
    EXPECT_EQ(aMessage, "");
  }
}

// Guards the column-0 fault: an invalid first pixel must not wipe out the
// sums of its valid neighbours in column 0 (the count always held them).
TEST(TextureTermsAndLine, PowerToAmplitudeNonFiniteOrInvalidFirstPixelNullsZeroMeanAndRoundingBelowZero) {
  const double aValues[5] = {4.0, -9.0, sNaN, std::numeric_limits<double>::infinity(), 2.0};
  const int32_t aMask[5] = {1, 1, 1, 1, 0};
  std::vector<double> aStore;
  std::vector<double *> aTerms = channels(aStore, CTLRX_TEXTURE_CHANNELS, 5);
  uint8_t aCentre[5];
  fdfTextureTerms(aValues, aMask, 5, true, aTerms.data(), aCentre);
  EXPECT_EQ(aTerms[0][0], 2.0);
  EXPECT_EQ(aTerms[1][0], 4.0);
  EXPECT_EQ(aTerms[0][1], 3.0); // square root of |v|
  for (int j = 2; j < 5; ++j) {
    EXPECT_EQ(aCentre[j], 0) << j;
    EXPECT_EQ(aTerms[0][j], 0.0) << j;
    EXPECT_EQ(aTerms[2][j], 0.0) << j;
  }
  const double aRow[5] = {100.0, 2.0, 3.0, 4.0, 5.0};
  const int32_t aFirstInvalid[5] = {0, 1, 1, 1, 1};
  fdfTextureTerms(aRow, aFirstInvalid, 5, false, aTerms.data(), aCentre);
  double aSums[3][5];
  int32_t aNonZero[5];
  for (int c = 0; c < 3; ++c)
    fdfRowWindowSum(aTerms[c], 5, 1, 3, aSums[c], aNonZero);
  EXPECT_EQ(std::vector<double>({aSums[0][0], aSums[1][0], aSums[2][0], aSums[0][1]}),
            std::vector<double>({2, 4, 1, 5}));
  EXPECT_EQ(aCentre[0], 0);
  EXPECT_EQ(aCentre[1], 1);
  // The line, columns: valid; invalid centre; empty window; zero sum; negative mean;
  // a constant 0.7 window whose q - m^2 rounds below zero.
  double aS1 = 0, aS2 = 0;
  for (int i = 0; i < 7; ++i) {
    aS1 += 0.7;
    aS2 += 0.7 * 0.7;
  }
  ASSERT_LT(7 * aS2 / (aS1 * aS1) - 1.0, 0.0) << "the case must round below zero";
  const double aLineSums[3][6] = {{10, 10, 0, 0, -4, aS1}, {60, 60, 0, 0, 20, aS2}, {2, 2, 0, 3, 2, 7}};
  const double *aWindow[3] = {aLineSums[0], aLineSums[1], aLineSums[2]};
  const uint8_t aLineCentre[6] = {1, 0, 1, 1, 1, 1};
  float aOut[6];
  fdfTextureLine(aWindow, aLineCentre, 6, -9999.0f, aOut);
  EXPECT_FLOAT_EQ(aOut[0], static_cast<float>(std::sqrt(30.0 - 25.0) / 5.0));
  for (int j = 1; j < 5; ++j)
    EXPECT_EQ(aOut[j], -9999.0f) << j;
  EXPECT_EQ(aOut[5], 0.0f);
}

TEST(CorrelationLineAndTerms, CoherenceClassesCutZeroOrMissingNormalisationAndOneSidedNoData) {
  // r = 1, 0.9 (g 0.894), 0.8 (g 0.775), 0.7 (g 0.632), 0.55 (g 0.316), 0.5, 0.2,
  // then A B = 0 and an invalid centre.
  const double aR[9] = {1.0, 0.9, 0.8, 0.7, 0.55, 0.5, 0.2, 1.0, 1.0};
  double aSums[3][9];
  for (int j = 0; j < 9; ++j) {
    aSums[0][j] = aR[j] * 6.0;
    aSums[1][j] = j == 7 ? 0.0 : 4.0;
    aSums[2][j] = 9.0;
  }
  const double *aWindow[3] = {aSums[0], aSums[1], aSums[2]};
  const uint8_t aCentre[9] = {1, 1, 1, 1, 1, 1, 1, 1, 0};
  float aOut[9];
  SCorrelationStats aStats;
  fdfCorrelationLine(aWindow, aCentre, 9, -1.0f, aOut, aStats);
  for (int j = 0; j < 5; ++j)
    EXPECT_FLOAT_EQ(aOut[j], static_cast<float>(std::sqrt(2 * aR[j] - 1))) << j;
  const float aRest[4] = {0.0f, 0.0f, -1.0f, -1.0f};
  for (int j = 5; j < 9; ++j)
    EXPECT_EQ(aOut[j], aRest[j - 5]) << j;
  EXPECT_EQ(std::vector<int64_t>({aStats.mComputed, aStats.mAbove08, aStats.mAbove07, aStats.mAbove05, aStats.mAbove0}),
            std::vector<int64_t>({7, 2, 1, 1, 1}));
  // Terms: zero or missing normalisation and one-sided no data count nothing.
  const double aV1[4] = {2.0, 2.0, 2.0, 2.0}, aV2[4] = {4.0, 4.0, 4.0, 4.0}, aNorm[4] = {4.0, 0.0, 4.0, 4.0};
  const int32_t aMask1[4] = {1, 1, 1, 0}, aMask2[4] = {1, 1, 1, 1}, aNormMask[4] = {1, 1, 0, 1};
  std::vector<double> aStore;
  std::vector<double *> aTerms = channels(aStore, 3, 4);
  uint8_t aTermsCentre[4];
  // Input 1 is an amplitude (squared), input 2 intensity.
  fdfCorrelationTerms(aV1, aMask1, false, aV2, aMask2, true, aNorm, aNormMask, 4, aTerms.data(), aTermsCentre);
  EXPECT_EQ(aTermsCentre[0], 1);
  for (int c = 0; c < 3; ++c)
    EXPECT_EQ(aTerms[c][0], 1.0) << c;
  for (int j = 1; j < 4; ++j) {
    EXPECT_EQ(aTermsCentre[j], 0) << j;
    for (int c = 0; c < 3; ++c)
      EXPECT_EQ(aTerms[c][j], 0.0) << j << " channel " << c;
  }
}


// Blocks of every length that is a multiple of R, each on a fresh ring that
// starts afresh at its first line, give the bytes of one run from line 0;
// such a block loads only the R - 1 lines above its window's reach again.
// The same blocks in order on one ring continue: every line loaded once.
TEST(WindowLines, BlocksStartingAtMultiplesOfRGiveTheRunFromLineZeroBitForBit) {
  const STestImage aImage = spikyImage(23);
  for (const SWindowShape &aShape : sShapes) {
    SCOPED_TRACE(shapeName(aShape));
    const std::vector<uint8_t> aWhole = wholeRun(aShape, aImage);
    const int32_t R = aShape.mRows, aBelow = aShape.below();
    for (int32_t aBlock = R; aBlock <= 2 * aImage.mLines; aBlock += R) {
      std::vector<uint8_t> aFresh, aContinued;
      std::vector<int32_t> aLoadedOnce;
      CWindowRing aOne(aShape, aImage.mLines, aImage.mPixels, 2);
      for (int32_t aFirst = 0; aFirst < aImage.mLines; aFirst += aBlock) {
        const int32_t aEnd = std::min(aImage.mLines, aFirst + aBlock);
        CWindowRing aRing(aShape, aImage.mLines, aImage.mPixels, 2);
        std::vector<int32_t> aLoaded;
        fdfRunWindowLines(
            aRing, aFirst, aEnd,
            [&](int32_t l) {
              aLoaded.push_back(l);
              loadImageLine(aRing, aImage, l);
            },
            [&](int32_t l) { recordLine(aRing, aRing.centre(l), aFresh); });
        ASSERT_FALSE(aLoaded.empty());
        EXPECT_EQ(aLoaded.front(), std::max(0, aFirst + aBelow - R + 1)) << "block at " << aFirst;
        EXPECT_EQ(aLoaded.back(), std::min(aImage.mLines - 1, aEnd - 1 + aBelow)) << "block at " << aFirst;
        EXPECT_EQ(aRing.nextLine(), aEnd);
        fdfRunWindowLines(
            aOne, aFirst, aEnd,
            [&](int32_t l) {
              aLoadedOnce.push_back(l);
              loadImageLine(aOne, aImage, l);
            },
            [&](int32_t l) { recordLine(aOne, aOne.centre(l), aContinued); });
      }
      EXPECT_TRUE(aFresh == aWhole) << "fresh blocks of " << aBlock;
      EXPECT_TRUE(aContinued == aWhole) << "continued blocks of " << aBlock;
      std::vector<int32_t> aEveryLine(static_cast<size_t>(aImage.mLines));
      std::iota(aEveryLine.begin(), aEveryLine.end(), 0);
      EXPECT_EQ(aLoadedOnce, aEveryLine) << "continued blocks of " << aBlock;
    }
  }
}

// A run starts afresh only at a multiple of R (elsewhere its first
// recomputation would come late and the results would depend on the block),
// or continues where its ring stopped; a run that failed leaves nothing to
// continue. Ranges outside the image are refused too.
TEST(WindowLines, StartsOffTheGridAndRangesOutsideTheImageAreRefused) {
  const STestImage aImage = spikyImage(10);
  const struct {
    int32_t mRows;
    std::vector<std::pair<int32_t, int32_t>> mBefore; // runs that succeed first
    int32_t mFirst, mEnd;
    bool mRefused;
  } aCases[] = {
      {3, {}, 1, 4, true},        {3, {}, 3, 6, false},          {3, {}, 0, 0, false},
      {3, {{0, 4}}, 4, 7, false}, {3, {{0, 4}}, 5, 7, true},     {3, {{0, 4}}, 6, 10, false},
      {3, {{6, 8}}, 8, 10, false}, {3, {{6, 8}}, 2, 5, true},    {3, {}, 0, 11, true},
      {3, {}, 6, 3, true},        {3, {}, -3, 2, true},          {4, {}, 2, 6, true},
      {4, {{4, 6}}, 6, 9, false}, {4, {{0, 9}}, 9, 10, false},   {4, {}, 8, 10, false},
  };
  for (const auto &aCase : aCases) {
    CWindowRing aRing({aCase.mRows, 3, ETLRXWindowBorder::kNull}, aImage.mLines, aImage.mPixels, 2);
    const auto aLoad = [&](int32_t l) { loadImageLine(aRing, aImage, l); };
    for (const auto &aRun : aCase.mBefore)
      fdfRunWindowLines(aRing, aRun.first, aRun.second, aLoad, [](int32_t) {});
    std::string aWhat;
    try {
      fdfRunWindowLines(aRing, aCase.mFirst, aCase.mEnd, aLoad, [](int32_t) {});
    } catch (const std::invalid_argument &aError) {
      aWhat = aError.what();
    }
    EXPECT_EQ(!aWhat.empty(), aCase.mRefused) << "R " << aCase.mRows << " lines " << aCase.mFirst << " .. " << aCase.mEnd;
    if (aCase.mRefused)
      EXPECT_NE(aWhat.find("a run starts at a multiple of " + std::to_string(aCase.mRows)), std::string::npos) << aWhat;
  }
  // A load that fails: the ring must start afresh, not continue.
  CWindowRing aRing({3, 3, ETLRXWindowBorder::kClipped}, aImage.mLines, aImage.mPixels, 2);
  EXPECT_THROW(fdfRunWindowLines(
                   aRing, 0, 6,
                   [&](int32_t l) {
                     if (l == 4)
                       throw std::runtime_error("read");
                     loadImageLine(aRing, aImage, l);
                   },
                   [](int32_t) {}),
               std::runtime_error);
  EXPECT_EQ(aRing.nextLine(), -1);
  EXPECT_THROW(fdfRunWindowLines(aRing, 4, 6, [](int32_t) {}, [](int32_t) {}), std::invalid_argument);
}

// Blocks are multiples of R, at least 4 R and about 64 lines, so the R - 1
// lines a block loads again stay within a quarter of it; bands hold whole
// blocks, no more than the image needs, and reach the window's lines.
TEST(BandPlan, BlockLinesAndBandsOfAnImage) {
  const std::pair<int32_t, int32_t> aBlocks[] = {{1, 64},   {2, 64},   {3, 66},   {7, 70},     {16, 64},
                                                 {17, 68}, {32, 128}, {33, 132}, {500, 2000}};
  for (const auto &aCase : aBlocks)
    EXPECT_EQ(fdfWindowBlockLines({aCase.first, 3, ETLRXWindowBorder::kNull}), aCase.second) << aCase.first;
  for (int32_t R = 1; R <= 500; ++R) {
    const int32_t aBlock = fdfWindowBlockLines({R, 3, ETLRXWindowBorder::kClipped});
    EXPECT_EQ(aBlock % R, 0) << R;
    EXPECT_LE(4 * (R - 1), aBlock) << R;
  }
  const struct {
    int32_t mLines, mBlock, mThreads, mPerThread, mAbove, mBelow, mBand;
  } aPlans[] = {{1000, 129, 3, 2, 1, 1, 774}, {1000, 129, 1, 2, 1, 1, 258}, {11, 129, 3, 2, 1, 1, 129},
                {260, 129, 3, 2, 0, 2, 387},  {0, 16, 2, 2, 0, 0, 16},       {300, 260, 2, 1, 64, 64, 520}};
  for (const auto &aCase : aPlans) {
    const SBandPlan aPlan =
        fdfBandPlan(aCase.mLines, aCase.mBlock, aCase.mThreads, aCase.mPerThread, aCase.mAbove, aCase.mBelow);
    EXPECT_EQ(aPlan.mBand, aCase.mBand) << aCase.mLines << " lines, " << aCase.mThreads << " threads";
    EXPECT_EQ(aPlan.bandInputLines(), aCase.mBand + aCase.mAbove + aCase.mBelow);
  }
  // 10 lines, blocks of 3, bands of 6, reach 2 above and 1 below.
  std::vector<std::vector<int32_t>> aSteps;
  fdfRunBands(
      fdfBandPlan(10, 3, 2, 1, 2, 1),
      [](int64_t theCount, const TLRXBlockBody &theBody) {
        for (int64_t i = theCount - 1; i >= 0; --i)
          theBody(i, 0);
      },
      [&](const SLineBand &b) { aSteps.push_back({0, b.mFirst, b.mCount, b.mInFirst, b.mInCount}); },
      [&](int32_t theFirst, int32_t theCount, int) { aSteps.push_back({1, theFirst, theCount}); },
      [&](const SLineBand &b) { aSteps.push_back({2, b.mFirst, b.mCount}); });
  EXPECT_EQ(aSteps, (std::vector<std::vector<int32_t>>{
                        {0, 0, 6, 0, 7}, {1, 3, 3}, {1, 0, 3}, {2, 0, 6}, {0, 6, 4, 4, 6}, {1, 9, 1}, {1, 6, 3}, {2, 6, 4}}));
}

namespace {

// The image through the band runner: the caller's band buffers of input
// lines (a copy of the image's lines, as a raster read would give) and of
// output lines, written in order into one record.
struct SBandRun {
  std::vector<uint8_t> mBytes;
  std::vector<SLineBand> mBands;
  std::vector<int32_t> mEmitted; // output lines in the order written
};

void bandRun(const SWindowShape &theShape, const STestImage &theImage, int theThreads,
             const TLRXParallelFor &theParallelFor, SBandRun &theRun,
             const std::function<void(int32_t)> &theLoadCheck = nullptr) {
  const size_t aPixels = static_cast<size_t>(theImage.mPixels);
  const size_t aLineBytes = 2 * aPixels * sizeof(double) + aPixels;
  CWindowBands aBands(theShape, theImage.mLines, theImage.mPixels, 2, theThreads, theParallelFor);
  std::vector<double> aInValues(static_cast<size_t>(aBands.plan().bandInputLines()) * aPixels);
  std::vector<int> aInValid(aInValues.size());
  std::vector<std::vector<uint8_t>> aOut(static_cast<size_t>(aBands.plan().mBand));
  SBandRun &aRun = theRun;
  SLineBand aBand;
  aBands.run(
      [&](const SLineBand &theBand) {
        aRun.mBands.push_back(theBand);
        aBand = theBand;
        for (int32_t i = 0; i < theBand.mInCount; ++i)
          for (size_t x = 0; x < aPixels; ++x) {
            const size_t aFrom = static_cast<size_t>(theBand.mInFirst + i) * aPixels + x;
            aInValues[static_cast<size_t>(i) * aPixels + x] = theImage.mValues[aFrom];
            aInValid[static_cast<size_t>(i) * aPixels + x] = theImage.mValid[aFrom];
          }
        for (auto &aLine : aOut)
          aLine.clear();
      },
      [&](CWindowRing &theRing, int32_t theLine, int) {
        if (theLoadCheck)
          theLoadCheck(theLine);
        // Only the band's own input lines are there to read.
        ASSERT_TRUE(theLine >= aBand.mInFirst && theLine < aBand.mInFirst + aBand.mInCount) << theLine;
        const size_t aRow = static_cast<size_t>(theLine - aBand.mInFirst) * aPixels;
        for (size_t x = 0; x < aPixels; ++x) {
          const bool aValid = aInValid[aRow + x] != 0 && std::isfinite(aInValues[aRow + x]);
          theRing.terms(0)[x] = aValid ? aInValues[aRow + x] : 0.0;
          theRing.terms(1)[x] = aValid ? 1.0 : 0.0;
          theRing.centre(theLine)[x] = aValid ? 1 : 0;
        }
      },
      [&](CWindowRing &theRing, int32_t theLine, int) {
        recordLine(theRing, theRing.centre(theLine), aOut[static_cast<size_t>(theLine - aBand.mFirst)]);
      },
      [&](const SLineBand &theBand) {
        for (int32_t i = 0; i < theBand.mCount; ++i) {
          aRun.mEmitted.push_back(theBand.mFirst + i);
          const std::vector<uint8_t> &aLine = aOut[static_cast<size_t>(i)];
          EXPECT_EQ(aLine.size(), aLineBytes) << "line " << theBand.mFirst + i << " emitted once";
          aRun.mBytes.insert(aRun.mBytes.end(), aLine.begin(), aLine.end());
        }
      });
}

// Blocks last first, on threads 0, 1, 2 in turn: what no real schedule
// promises not to do.
void reversedParallelFor(int64_t theCount, const TLRXBlockBody &theBody) {
  for (int64_t i = theCount - 1; i >= 0; --i)
    theBody(i, static_cast<int>(i % 3));
}

} // namespace

// 1, 2 and 3 threads, and blocks run in reverse order on rotating threads,
// give the bytes of one ring from line 0: several bands, a last band and block
// cut short (1000 lines), an image smaller than one block (11 lines), a block
// of 280 lines (R = 70) and both border rules, R odd and even. The bands are
// read in order, each with the window's reach clipped to the image, and the
// output lines written once each, in order; one thread loads every input line
// once. (The run from line 0 is checked against direct sums above.)
TEST(WindowBands, AnyThreadCountAndBlockOrderGiveTheRunFromLineZero) {
  const SWindowShape aShapes[] = {{3, 3, ETLRXWindowBorder::kClipped}, {4, 5, ETLRXWindowBorder::kClipped},
                                  {70, 3, ETLRXWindowBorder::kClipped}, {5, 2, ETLRXWindowBorder::kNull},
                                  {8, 3, ETLRXWindowBorder::kNull}};
  for (const int32_t aLines : {1000, 11}) {
    STestImage aImage = randomImage(aLines, 5, 17, 0.5, 20.0, {0, 7, 33, 129 * 5 + 2, 4999});
    if (aLines > 400)
      aImage.mValues[400 * 5 + 1] = 1e20;
    for (const SWindowShape &aShape : aShapes) {
      SCOPED_TRACE(shapeName(aShape) + ", " + std::to_string(aLines) + " lines");
      const std::vector<uint8_t> aWhole = wholeRun(aShape, aImage);
      std::vector<int32_t> aEveryLine(static_cast<size_t>(aLines));
      std::iota(aEveryLine.begin(), aEveryLine.end(), 0);
      const int32_t aAbove = aShape.mRows - 1 - aShape.below();
      for (const int aThreads : {0, 1, 2, 3}) { // 0: the reversed schedule
        const CTestThreads aSetting(std::max(1, aThreads));
        std::vector<int32_t> aLoads(static_cast<size_t>(aLines), 0);
        const std::function<void(int32_t)> aCount = [&](int32_t l) { ++aLoads[static_cast<size_t>(l)]; };
        SBandRun aRun;
        bandRun(aShape, aImage, aThreads == 0 ? 3 : aThreads,
                aThreads == 0 ? TLRXParallelFor(reversedParallelFor) : TLRXParallelFor(fdfParallelFor), aRun,
                aThreads == 1 ? aCount : nullptr);
        if (aThreads == 1)
          EXPECT_EQ(aLoads, std::vector<int32_t>(static_cast<size_t>(aLines), 1));
        EXPECT_TRUE(aRun.mBytes == aWhole) << aThreads << " threads";
        EXPECT_EQ(aRun.mEmitted, aEveryLine) << aThreads << " threads";
        int32_t aNext = 0;
        for (const SLineBand &aBand : aRun.mBands) {
          EXPECT_EQ(aBand.mFirst, aNext);
          EXPECT_EQ(aBand.mInFirst, std::max(0, aBand.mFirst - aAbove));
          EXPECT_EQ(aBand.mInFirst + aBand.mInCount, std::min(aLines, aBand.mFirst + aBand.mCount + aShape.below()));
          aNext += aBand.mCount;
        }
        if (aLines == 1000 && aThreads > 0)
          EXPECT_GE(aRun.mBands.size(), 2u) << aThreads << " threads";
      }
    }
  }
}

// A numbered error raised by a block comes out on the calling thread as with
// one thread: the one of the lowest line (blocks of later lines fail too),
// and no output line whose window holds it, nor any after, is written.
TEST(WindowBands, TheErrorOfTheFirstFailingLineIsRaisedWhateverTheThreads) {
  const STestImage aImage = randomImage(1000, 5, 19, 0.5, 20.0, {});
  for (const int aThreads : CTLRX_TEST_THREADS) {
    const CTestThreads aSetting(aThreads);
    std::string aMessage;
    SBandRun aRun;
    const int32_t aCode = tlrxRaisedCode(
        [&] {
          bandRun({3, 3, ETLRXWindowBorder::kClipped}, aImage, aThreads, fdfParallelFor, aRun, [](int32_t theLine) {
            if (theLine == 70 || theLine == 150 || theLine == 990) // 70 and 150: two blocks of a band
              TLRX_RAISE_F(CTLRX_ERR_FILE_READ, "line %d", theLine);
          });
        },
        &aMessage);
    EXPECT_EQ(aCode, CTLRX_ERR_FILE_READ) << aThreads;
    EXPECT_EQ(aMessage, "line 70") << aThreads;
    std::vector<int32_t> aPrefix(aRun.mEmitted.size());
    std::iota(aPrefix.begin(), aPrefix.end(), 0);
    EXPECT_EQ(aRun.mEmitted, aPrefix) << aThreads;
    EXPECT_LE(static_cast<int32_t>(aRun.mEmitted.size()), 69) << aThreads; // line 69 holds line 70
  }
}
