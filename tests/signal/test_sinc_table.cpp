// The tabulated Knab sinc: the shape of its rows, the split of a position and
// the edge rules of a line. Its accuracy on band-limited speckle is checked
// through the slave resampler (test_slave_resampler.cpp).
#include "tlrx_fft.h"
#include "tlrx_sinc_table.h"

#include <gtest/gtest.h>

#include <cmath>
#include <complex>
#include <numeric>
#include <vector>

// Unit sum, an impulse at whole samples, symmetry at half a sample, and the
// last row the first moved by one tap.
TEST(SincTable, RowsHaveUnitSumAndTheExpectedShape) {
  const CSincTable aTable(1.2);
  for (int r = 0; r <= CTLRX_SINC_STEPS; r += 97) {
    const float *w = aTable.weights(double(r) / CTLRX_SINC_STEPS);
    EXPECT_NEAR(std::accumulate(w, w + CTLRX_SINC_TAPS, 0.0), 1.0, 1e-6) << r;
  }
  const float *aZero = aTable.weights(0.0), *aOne = aTable.weights(1.0), *aHalf = aTable.weights(0.5);
  for (int k = 0; k < CTLRX_SINC_TAPS; ++k) {
    EXPECT_NEAR(aZero[k], k == CTLRX_SINC_BEFORE ? 1.0 : 0.0, 1e-7) << k;
    EXPECT_NEAR(aOne[k], k == CTLRX_SINC_BEFORE + 1 ? 1.0 : 0.0, 1e-7) << k;
    EXPECT_FLOAT_EQ(aHalf[k], aHalf[CTLRX_SINC_TAPS - 1 - k]) << k;
  }
  // The kernel itself: 1 at 0, 0 at the whole samples and from L/2 on, and
  // the window's value at x = 0.5 for v = 1/6 from the formula.
  EXPECT_EQ(CSincTable::knab(0.0, 1.0 / 6), 1.0);
  for (double x : {1.0, -2.0, 3.0, 4.0, -4.5, 7.0})
    EXPECT_NEAR(CSincTable::knab(x, 1.0 / 6), 0.0, 1e-15) << x;
  EXPECT_NEAR(CSincTable::knab(0.5, 1.0 / 6), (2 / M_PI) * std::cosh(M_PI / 6 * 4 * std::sqrt(1 - 1.0 / 64)) /
                                                 std::cosh(M_PI / 6 * 4), 1e-15);
}

TEST(SincTable, PositionsSplitIntoSampleAndTableFraction) {
  const struct {
    double mPosition;
    int64_t mFirst;
    double mFraction;
  } aCases[] = {{2.25, 2, 0.25},
                {5.0, 5, 0.0},
                {-0.5, -1, 0.5},
                {-0.0001, 0, 0.0},                 // rounds up to the next sample
                {3.99999, 4, 0.0},
                {7.1, 7, 205.0 / CTLRX_SINC_STEPS}, // 0.1 x 2048 = 204.8 -> row 205
                {1e6 + 0.75, 1000000, 0.75}};
  for (const auto &aCase : aCases) {
    int64_t aFirst = -99;
    double aFraction = -1;
    fdfSplitPosition(aCase.mPosition, aFirst, aFraction);
    EXPECT_EQ(aFirst, aCase.mFirst) << aCase.mPosition;
    EXPECT_DOUBLE_EQ(aFraction, aCase.mFraction) << aCase.mPosition;
  }
}

// Outside [0, n - 1] gives exactly 0; whole positions give the sample; a
// constant is kept inside; near an edge the missing taps act as zeros, as
// they would on a line padded with zeros.
TEST(SincTable, LineEdgesFollowTheZeroTapRule) {
  const CSincTable aTable(1.2);
  const int n = 20, aPad = 8;
  std::vector<TLRXComplex> aLine(n, TLRXComplex(2.0f, -1.0f)), aPadded(n + 2 * aPad, TLRXComplex(0, 0));
  std::copy(aLine.begin(), aLine.end(), aPadded.begin() + aPad);
  aLine[7] = TLRXComplex(5.0f, 3.0f);
  aPadded[7 + aPad] = aLine[7];
  const double aPositions[] = {-1e-9, -3.0, n - 1 + 1e-9, 40.0, NAN, 0.0, 7.0, n - 1.0, 0.4, 2.6, 17.3, 12.45};
  const int aCount = int(std::size(aPositions));
  std::vector<TLRXComplex> aOut(aCount), aPaddedOut(aCount);
  std::vector<double> aShifted(aPositions, aPositions + aCount);
  for (double &p : aShifted)
    p += aPad;
  fdfSincResampleLine(aTable, aLine.data(), n, aPositions, aCount, aOut.data());
  fdfSincResampleLine(aTable, aPadded.data(), n + 2 * aPad, aShifted.data(), aCount, aPaddedOut.data());
  for (int i = 0; i < 5; ++i)
    EXPECT_EQ(aOut[size_t(i)], TLRXComplex(0, 0)) << aPositions[i];
  EXPECT_EQ(aOut[5], aLine[0]);
  EXPECT_EQ(aOut[6], aLine[7]);
  EXPECT_EQ(aOut[7], aLine[n - 1]);
  for (int i = 8; i < aCount; ++i)
    EXPECT_LT(std::abs(aOut[size_t(i)] - aPaddedOut[size_t(i)]), 1e-6) << aPositions[i];
  EXPECT_GT(std::abs(aOut[8] - aLine[0]), 0.01);     // the edge is felt at 0.4
  EXPECT_LT(std::abs(aOut[11] - aLine[12]), 2e-6);   // far from 7 and from the edges a constant stays
}
