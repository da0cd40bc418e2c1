// The window machinery on plain buffers: row-window running sums, the ring
// with its line schedule, and the per-line formulas, against direct sums.
#include "tlrx_errors.h"
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
  int32_t aNonZero[5];
  fdfRowWindowSum(aTermPointers[0], 5, 1, 3, aSum, aNonZero);
  fdfRowWindowSum(aTermPointers[1], 5, 1, 3, aSquares, aNonZero);
  fdfRowWindowSum(aTermPointers[2], 5, 1, 3, aCount, aNonZero);
  EXPECT_EQ(aSum[0], 2.0);
  EXPECT_EQ(aSquares[0], 4.0);
  EXPECT_EQ(aCount[0], 1.0);
  EXPECT_EQ(aSum[1], 5.0);
  EXPECT_EQ(aCentre[0], 0);
  EXPECT_EQ(aCentre[1], 1);
}

namespace {

// Streams theImage through a ring of theShape with channels value and count;
// at each emitted line, theCheck(line, pixel, centre, sum, count) for every
// pixel. Checks that every line is loaded once, in order, and emitted once.
void streamImage(const STestImage &theImage, const SWindowShape &theShape,
                 const std::function<void(int, int, int, double, double)> &theCheck) {
  CWindowRing aRing(theShape, theImage.mLines, theImage.mPixels, 2);
  std::vector<int> aLoaded;
  int aEmitted = 0;
  fdfRunWindowSchedule(
      aRing,
      [&](int32_t theLine) {
        aLoaded.push_back(theLine);
        for (int x = 0; x < theImage.mPixels; ++x) {
          const bool aValid = theImage.valid(theLine, x);
          aRing.terms(0)[x] = aValid ? theImage.at(theLine, x) : 0.0;
          aRing.terms(1)[x] = aValid ? 1.0 : 0.0;
          aRing.centre(theLine)[x] = aValid ? 1 : 0;
        }
      },
      [&](int32_t theLine) {
        ASSERT_EQ(theLine, aEmitted++);
        for (int j = 0; j < theImage.mPixels; ++j)
          theCheck(theLine, j, aRing.centre(theLine)[j], aRing.column(0)[j], aRing.column(1)[j]);
      });
  EXPECT_EQ(aEmitted, theImage.mLines);
  std::vector<int> aInOrder;
  for (int l = 0; l < theImage.mLines; ++l)
    aInOrder.push_back(l);
  EXPECT_EQ(aLoaded, aInOrder);
}

} // namespace

// Clipped windows on a 7 x 9 image, odd and even, taller (7 lines) and wider
// (9 pixels) than the image: the accumulators at each emitted line equal the
// direct window sums and the centre flags are those of the line.
TEST(WindowSchedule, ClippedWindowsEqualDirectWindowSums) {
  const STestImage aImage = sevenByNine(11);
  for (int aRows : {1, 2, 3, 4, 5, 6, 7, 8, 9, 14, 15}) {
    for (int aCols : {1, 2, 3, 4, 5, 8, 9, 17, 18}) {
      streamImage(aImage, {aRows, aCols, ETLRXWindowBorder::kClipped},
                  [&](int l, int j, int theCentre, double theSum, double theCount) {
                    const std::string aWhere = "R " + std::to_string(aRows) + " K " + std::to_string(aCols) +
                                               " at (" + std::to_string(l) + ", " + std::to_string(j) + ")";
                    EXPECT_NEAR(theSum, directSum(aImage, aRows, aCols, l, j, [](double v) { return v; }), 1e-9)
                        << aWhere;
                    EXPECT_EQ(theCount, directSum(aImage, aRows, aCols, l, j, [](double) { return 1.0; })) << aWhere;
                    EXPECT_EQ(theCentre, aImage.valid(l, j) ? 1 : 0) << aWhere;
                  });
    }
  }
}

// Exact R x K windows with null borders (no step uses them yet): inside, the
// accumulators equal the direct sums over lines l - R/2 .. l - R/2 + R - 1 and
// columns j - K/2 .. j - K/2 + K - 1; the first and last R/2 lines and K/2
// columns are never computed, and a window larger than the image leaves
// nothing to compute.
TEST(WindowSchedule, ExactWindowsEqualDirectSumsWithNullBorders) {
  const STestImage aImage = sevenByNine(13);
  for (int aRows : {2, 3, 4, 5, 7, 8}) {
    for (int aCols : {2, 3, 4, 6, 9, 10}) {
      streamImage(aImage, {aRows, aCols, ETLRXWindowBorder::kNull},
                  [&](int l, int j, int theCentre, double theSum, double theCount) {
                    const std::string aWhere = "R " + std::to_string(aRows) + " K " + std::to_string(aCols) +
                                               " at (" + std::to_string(l) + ", " + std::to_string(j) + ")";
                    double aSum = 0, aCount = 0;
                    const bool aInside = refForExactWindow(aImage.mLines, aImage.mPixels, aRows, aCols, l, j,
                                                           [&](int y, int x) {
                                                             if (aImage.valid(y, x)) {
                                                               aSum += aImage.at(y, x);
                                                               aCount += 1;
                                                             }
                                                           });
                    EXPECT_EQ(theCentre, aInside && aImage.valid(l, j) ? 1 : 0) << aWhere;
                    if (aInside) {
                      EXPECT_NEAR(theSum, aSum, 1e-9) << aWhere;
                      EXPECT_EQ(theCount, aCount) << aWhere;
                    }
                  });
    }
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
  struct SCase {
    const SWindowRule &mRule;
    int32_t mRows, mCols, mCode;
  } const aCases[] = {
      {CTLRX_CLIPPED_WINDOW_RULE, 3, 3, 0},        {CTLRX_CLIPPED_WINDOW_RULE, 4, 500, 0},
      {CTLRX_CLIPPED_WINDOW_RULE, 2, 5, 456961},   {CTLRX_CLIPPED_WINDOW_RULE, 501, 5, 456961},
      {CTLRX_CLIPPED_WINDOW_RULE, 5, 2, 456961},   {CTLRX_CLIPPED_WINDOW_RULE, 3, 501, 456961},
      {CTLRX_CLIPPED_WINDOW_RULE, 0, 0, 456961},   {CTLRX_CLIPPED_WINDOW_RULE, -3, 7, 456961},
      {CTLRX_EXACT_WINDOW_RULE, 2, 2, 0},          {CTLRX_EXACT_WINDOW_RULE, 1, 5, 456962},
      {CTLRX_EXACT_WINDOW_RULE, 5, 1, 456962},
  };
  for (const SCase &aCase : aCases) {
    std::string aMessage;
    EXPECT_EQ(tlrxRaisedCode([&] { fdfCheckWindowSize(aCase.mRows, aCase.mCols, aCase.mRule); }, &aMessage),
              aCase.mCode)
        << aCase.mRows << " x " << aCase.mCols;
    EXPECT_EQ(aMessage, "");
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
  const double aValues[5] = {4.0, -9.0, sNaN, std::numeric_limits<double>::infinity(), 2.0};
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
