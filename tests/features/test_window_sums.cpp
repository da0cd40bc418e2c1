// The window machinery on plain buffers: row-window running sums, the ring
// with its line schedule, and the per-line formulas, against direct sums.
#include "tlrx_command_test_support.h"
#include "tlrx_window_measures.h"
#include "tlrx_window_reference.h"
#include "tlrx_window_step.h"
#include "tlrx_window_sums.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <random>

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

