// The window machinery on plain buffers: row-window running sums, the ring
// with its line schedule, and the per-line formulas, against direct sums.
#include "tlrx_errors.h"
#include "tlrx_window_measures.h"
#include "tlrx_window_reference.h"
#include "tlrx_window_step.h"
#include "tlrx_window_sums.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <random>

namespace {

constexpr double theNaN = std::numeric_limits<double>::quiet_NaN();

// A 7 x 9 image with no-data pixels on the corners, an edge and inside,
// among them the first pixel of several lines.
STestImage sevenByNine(uint64_t theSeed) {
  STestImage aImage;
  aImage.mLines = 7;
  aImage.mPixels = 9;
  std::mt19937_64 aEngine(theSeed);
  std::uniform_real_distribution<double> aValue(0.5, 20.0);
  for (int i = 0; i < 63; ++i) {
    aImage.mValues.push_back(aValue(aEngine));
    aImage.mValid.push_back(1);
  }
  for (int aNoData : {0, 8, 9, 18, 31, 32, 40, 54, 62})
    aImage.mValid[aNoData] = 0;
  return aImage;
}

// Window sums of theTerm over the valid pixels, computed directly.
double directSum(const STestImage &theImage, int theRows, int theCols, int theLine, int thePixel,
                 const std::function<double(double)> &theTerm) {
  double aSum = 0;
  refForWindow(theImage.mLines, theImage.mPixels, theRows, theCols, theLine, thePixel, [&](int y, int x) {
    if (theImage.valid(y, x))
      aSum += theTerm(theImage.at(y, x));
  });
  return aSum;
}

} // namespace

TEST(RowWindowSum, MatchesDirectSumsForEveryHalfWidthAndLength) {
  std::mt19937_64 aEngine(7);
  std::uniform_real_distribution<double> aValue(-3.0, 11.0);
  for (int aPixels = 1; aPixels <= 13; ++aPixels) {
    std::vector<double> aTerms(aPixels);
    for (double &aTerm : aTerms)
      aTerm = aValue(aEngine);
    for (int aHalf = 0; aHalf <= 15; ++aHalf) {
      std::vector<double> aSums(aPixels, theNaN);
      fdfRowWindowSum(aTerms.data(), aPixels, aHalf, aSums.data());
      for (int j = 0; j < aPixels; ++j) {
        double aWant = 0;
        for (int k = std::max(0, j - aHalf); k <= std::min(aPixels - 1, j + aHalf); ++k)
          aWant += aTerms[k];
        EXPECT_NEAR(aSums[j], aWant, 1e-12) << "P " << aPixels << " half " << aHalf << " column " << j;
      }
    }
  }
}

// Guards the column-0 fault: an invalid first pixel must not wipe out the
// sums of its valid neighbours in column 0 (the count always held them).
TEST(RowWindowSum, InvalidFirstPixelKeepsColumnZeroSums) {
  const double aValues[5] = {100.0, 2.0, 3.0, 4.0, 5.0};
  const int32_t aMask[5] = {0, 1, 1, 1, 1};
  std::vector<double> aTerms[CTLRX_TEXTURE_CHANNELS];
  double *aTermPointers[CTLRX_TEXTURE_CHANNELS];
  for (int c = 0; c < CTLRX_TEXTURE_CHANNELS; ++c) {
    aTerms[c].assign(5, 0.0);
    aTermPointers[c] = aTerms[c].data();
  }
  uint8_t aCentre[5];
  fdfTextureTerms(aValues, aMask, 5, false, aTermPointers, aCentre);
  double aSum[5], aSquares[5], aCount[5];
  fdfRowWindowSum(aTermPointers[0], 5, 1, aSum);
  fdfRowWindowSum(aTermPointers[1], 5, 1, aSquares);
  fdfRowWindowSum(aTermPointers[2], 5, 1, aCount);
  EXPECT_EQ(aSum[0], 2.0);
  EXPECT_EQ(aSquares[0], 4.0);
  EXPECT_EQ(aCount[0], 1.0);
  EXPECT_EQ(aSum[1], 5.0);
  EXPECT_EQ(aCentre[0], 0);
  EXPECT_EQ(aCentre[1], 1);
}

// The ring and the line schedule on a 7 x 9 image for odd and even windows,
// windows taller than the image (7 lines) and wider than it (9 pixels): the
// accumulators at each emitted line equal the direct window sums, every line
// is loaded once in order, and the centre flags are those of the line.
TEST(WindowSchedule, AccumulatorsEqualDirectWindowSums) {
  const STestImage aImage = sevenByNine(11);
  for (int aRows : {1, 2, 3, 4, 5, 6, 7, 8, 9, 14, 15}) {
    for (int aCols : {1, 2, 3, 4, 5, 8, 9, 17, 18}) {
      CWindowRing aRing(aRows, aCols, aImage.mPixels, 2);
      std::vector<int> aLoaded;
      int aEmitted = 0;
      fdfRunWindowSchedule(
          aRing, aImage.mLines,
          [&](int32_t theLine) {
            aLoaded.push_back(theLine);
            for (int x = 0; x < aImage.mPixels; ++x) {
              const bool aValid = aImage.valid(theLine, x);
              aRing.terms(0)[x] = aValid ? aImage.at(theLine, x) : 0.0;
              aRing.terms(1)[x] = aValid ? 1.0 : 0.0;
              aRing.centre(theLine)[x] = aValid ? 1 : 0;
            }
          },
          [&](int32_t theLine) {
            ASSERT_EQ(theLine, aEmitted++);
            for (int j = 0; j < aImage.mPixels; ++j) {
              const std::string aWhere = "R " + std::to_string(aRows) + " K " + std::to_string(aCols) + " at (" +
                                         std::to_string(theLine) + ", " + std::to_string(j) + ")";
              EXPECT_NEAR(aRing.column(0)[j],
                          directSum(aImage, aRows, aCols, theLine, j, [](double v) { return v; }), 1e-9)
                  << aWhere;
              EXPECT_EQ(aRing.column(1)[j],
                        directSum(aImage, aRows, aCols, theLine, j, [](double) { return 1.0; }))
                  << aWhere;
              EXPECT_EQ(aRing.centre(theLine)[j], aImage.valid(theLine, j) ? 1 : 0) << aWhere;
            }
          },
          nullptr);
      EXPECT_EQ(aEmitted, aImage.mLines);
      std::vector<int> aInOrder;
      for (int l = 0; l < aImage.mLines; ++l)
        aInOrder.push_back(l);
      EXPECT_EQ(aLoaded, aInOrder) << "R " << aRows;
    }
  }
}

TEST(WindowSize, ThreeToFiveHundredRowsAndColumns) {
  for (int aGood : {3, 4, 250, 500})
    EXPECT_NO_THROW(fdfCheckWindowSize(aGood, aGood));
  const std::pair<int, int> aBad[] = {{2, 5}, {501, 5}, {5, 2}, {3, 501}, {0, 0}, {-3, 7}};
  for (const auto &aSizes : aBad) {
    try {
      fdfCheckWindowSize(aSizes.first, aSizes.second);
      ADD_FAILURE() << aSizes.first << " x " << aSizes.second << " accepted";
    } catch (const CErrorExceptionManager &aError) {
      EXPECT_EQ(aError.mCode, 456961);
      EXPECT_STREQ(aError.mMessage, "");
    }
  }
}

namespace {

// The sums of one window given directly to a line formula.
struct SOneWindow {
  std::vector<std::vector<double>> mSums;
  std::vector<const double *> pointers() const {
    std::vector<const double *> aOut;
    for (const auto &aSum : mSums)
      aOut.push_back(aSum.data());
    return aOut;
  }
};

} // namespace

TEST(TextureLine, NullsZeroMeanAndRoundingBelowZero) {
  // Columns: valid; invalid centre; empty window; zero sum; negative mean;
  // a constant 0.7 window whose q - m^2 rounds below zero.
  const double aSeven = 0.7;
  const double aN = 7;
  double aS1 = 0, aS2 = 0;
  for (int i = 0; i < 7; ++i) {
    aS1 += aSeven;
    aS2 += aSeven * aSeven;
  }
  ASSERT_LT(aN * aS2 / (aS1 * aS1) - 1.0, 0.0) << "the case must round below zero";
  SOneWindow aWindow{{{10, 10, 0, 0, -4, aS1}, {60, 60, 0, 0, 20, aS2}, {2, 2, 0, 3, 2, aN}}};
  const uint8_t aCentre[6] = {1, 0, 1, 1, 1, 1};
  float aOut[6];
  fdfTextureLine(aWindow.pointers().data(), aCentre, 6, -9999.0f, aOut);
  EXPECT_FLOAT_EQ(aOut[0], static_cast<float>(std::sqrt(30.0 - 25.0) / 5.0));
  EXPECT_EQ(aOut[1], -9999.0f);
  EXPECT_EQ(aOut[2], -9999.0f);
  EXPECT_EQ(aOut[3], -9999.0f);
  EXPECT_EQ(aOut[4], -9999.0f);
  EXPECT_EQ(aOut[5], 0.0f);
}

TEST(TextureTerms, PowerIsTakenToAmplitudeAndNonFiniteValuesDoNotCount) {
  const double aValues[5] = {4.0, -9.0, theNaN, std::numeric_limits<double>::infinity(), 2.0};
  const int32_t aMask[5] = {1, 1, 1, 1, 0};
  std::vector<double> aStore(3 * 5);
  double *aTerms[3] = {&aStore[0], &aStore[5], &aStore[10]};
  uint8_t aCentre[5];
  fdfTextureTerms(aValues, aMask, 5, true, aTerms, aCentre);
  EXPECT_EQ(aTerms[0][0], 2.0);
  EXPECT_EQ(aTerms[1][0], 4.0);
  EXPECT_EQ(aTerms[0][1], 3.0); // square root of |v|
  for (int j = 2; j < 5; ++j) {
    EXPECT_EQ(aCentre[j], 0) << j;
    EXPECT_EQ(aTerms[0][j], 0.0) << j;
    EXPECT_EQ(aTerms[2][j], 0.0) << j;
  }
}

TEST(CorrelationLine, CoherenceClassesAndCut) {
  // r = 1, 0.9 (g 0.894), 0.8 (g 0.775), 0.7 (g 0.632), 0.55 (g 0.316), 0.5, 0.2,
  // then A B = 0 and an invalid centre.
  const std::vector<double> aR = {1.0, 0.9, 0.8, 0.7, 0.55, 0.5, 0.2, 1.0, 1.0};
  SOneWindow aWindow{{{}, {}, {}}};
  for (double r : aR) {
    aWindow.mSums[0].push_back(r * 6.0);
    aWindow.mSums[1].push_back(4.0);
    aWindow.mSums[2].push_back(9.0);
  }
  aWindow.mSums[1][7] = 0.0;
  const uint8_t aCentre[9] = {1, 1, 1, 1, 1, 1, 1, 1, 0};
  float aOut[9];
  SCorrelationStats aStats;
  fdfCorrelationLine(aWindow.pointers().data(), aCentre, 9, -1.0f, aOut, aStats);
  for (int j = 0; j < 5; ++j)
    EXPECT_FLOAT_EQ(aOut[j], static_cast<float>(std::sqrt(2 * aR[j] - 1))) << j;
  EXPECT_EQ(aOut[5], 0.0f);
  EXPECT_EQ(aOut[6], 0.0f);
  EXPECT_EQ(aOut[7], -1.0f);
  EXPECT_EQ(aOut[8], -1.0f);
  EXPECT_EQ(aStats.mComputed, 7);
  EXPECT_EQ(aStats.mAbove08, 2);
  EXPECT_EQ(aStats.mAbove07, 1);
  EXPECT_EQ(aStats.mAbove05, 1);
  EXPECT_EQ(aStats.mAbove0, 1);
}

TEST(CorrelationTerms, ZeroOrMissingNormalisationAndOneSidedNoData) {
  const double aV1[4] = {2.0, 2.0, 2.0, 2.0};
  const double aV2[4] = {4.0, 4.0, 4.0, 4.0};
  const int32_t aMask1[4] = {1, 1, 1, 0};
  const int32_t aMask2[4] = {1, 1, 1, 1};
  const double aNorm[4] = {4.0, 0.0, 4.0, 4.0};
  const int32_t aNormMask[4] = {1, 1, 0, 1};
  std::vector<double> aStore(12);
  double *aTerms[3] = {&aStore[0], &aStore[4], &aStore[8]};
  uint8_t aCentre[4];
  // Input 1 is an amplitude (squared), input 2 intensity.
  fdfCorrelationTerms(aV1, aMask1, false, aV2, aMask2, true, aNorm, aNormMask, 4, aTerms, aCentre);
  EXPECT_EQ(aCentre[0], 1);
  EXPECT_EQ(aTerms[0][0], 1.0);
  EXPECT_EQ(aTerms[1][0], 1.0);
  EXPECT_EQ(aTerms[2][0], 1.0);
  for (int j = 1; j < 4; ++j) {
    EXPECT_EQ(aCentre[j], 0) << j;
    for (int c = 0; c < 3; ++c)
      EXPECT_EQ(aTerms[c][j], 0.0) << j << " channel " << c;
  }
}
