// FFT plans against a naive DFT, and the matrix-DFT zoom against a zero-padded
// inverse transform.
#include "tlrx_fft.h"

#include <gtest/gtest.h>

#include <cmath>
#include <random>

namespace {

// O(N^2) DFT in double precision: sign -1 forward, +1 inverse, unnormalised.
std::vector<std::complex<double>> naiveDft(const CFftBuffer &theIn, int theRows, int theCols, int theSign) {
  std::vector<std::complex<double>> aOut(theIn.size());
  for (int u = 0; u < theRows; ++u)
    for (int v = 0; v < theCols; ++v)
      for (int r = 0; r < theRows; ++r)
        for (int c = 0; c < theCols; ++c)
          aOut[size_t(u * theCols + v)] += std::complex<double>(theIn[size_t(r * theCols + c)]) *
                                           std::polar(1.0, theSign * 2 * M_PI * (double(u) * r / theRows + double(v) * c / theCols));
  return aOut;
}

void fillRandom(CFftBuffer &theBuffer, unsigned theSeed) {
  std::mt19937 aRandom(theSeed);
  std::normal_distribution<float> aNormal;
  for (size_t i = 0; i < theBuffer.size(); ++i)
    theBuffer[i] = TLRXComplex(aNormal(aRandom), aNormal(aRandom));
}

} // namespace

TEST(Fft, ForwardAndInverseEqualTheNaiveDftAtSizes15And16) {
  for (const int aRows : {15, 16})
    for (const int aCols : {15, 16})
      for (const ETLRXFftDirection aDirection : {ETLRXFftDirection::FORWARD, ETLRXFftDirection::INVERSE}) {
        SCOPED_TRACE(std::to_string(aRows) + " x " + std::to_string(aCols));
        CFftBuffer aData(size_t(aRows * aCols));
        fillRandom(aData, unsigned(aRows * 100 + aCols));
        const auto aExpected = naiveDft(aData, aRows, aCols, aDirection == ETLRXFftDirection::FORWARD ? -1 : 1);
        ASSERT_TRUE(fdfFftPlan(aRows, aCols, aDirection).execute(aData.data()));
        for (size_t i = 0; i < aData.size(); ++i)
          ASSERT_LT(std::abs(std::complex<double>(aData[i]) - aExpected[i]), 2e-4 * std::sqrt(double(aData.size())));
      }
}

TEST(Fft, PlansAreMadeOncePerSizeAndFailuresAreReported) {
  EXPECT_EQ(&fdfFftPlan(16, 15, ETLRXFftDirection::FORWARD), &fdfFftPlan(16, 15, ETLRXFftDirection::FORWARD));
  EXPECT_NE(&fdfFftPlan(16, 15, ETLRXFftDirection::FORWARD), &fdfFftPlan(16, 15, ETLRXFftDirection::INVERSE));
  EXPECT_NE(&fdfFftPlan(16, 15, ETLRXFftDirection::FORWARD), &fdfFftPlan(15, 16, ETLRXFftDirection::FORWARD));
  // A misaligned array, a null array and sizes that make no plan fail instead of transforming.
  CFftBuffer aData(16 * 16 + 1);
  const CFftPlan2D &aPlan = fdfFftPlan(16, 16, ETLRXFftDirection::FORWARD);
  EXPECT_TRUE(aPlan.execute(aData.data()));
  EXPECT_FALSE(aPlan.execute(reinterpret_cast<TLRXComplex *>(reinterpret_cast<float *>(aData.data()) + 1)));
  EXPECT_FALSE(aPlan.execute(nullptr));
  for (const auto &aSize : {std::pair<int, int>{0, 16}, {16, -1}, {1 << 14, 1 << 14}}) {
    const CFftPlan2D &aBad = fdfFftPlan(aSize.first, aSize.second, ETLRXFftDirection::FORWARD);
    EXPECT_FALSE(aBad.isValid());
    EXPECT_FALSE(aBad.execute(aData.data()));
  }
}

// The zoom equals the zero-padded inverse FFT at its points, Nyquist bins of
// even sizes split in half, for centres anywhere (negative, wrapped).
TEST(Fft, ZoomEqualsTheZeroPaddedInverseTransform) {
  const int aFactor = 4, aHalf = 5;
  for (const int aRows : {15, 16})
    for (const int aCols : {16, 15}) {
      CFftBuffer aSpectrum(size_t(aRows * aCols)), aPadded(size_t(aRows * aCols * aFactor * aFactor));
      fillRandom(aSpectrum, unsigned(aRows + aCols));
      fdfZeroPadSpectrum(aSpectrum.data(), aRows, aCols, aPadded.data(), aFactor * aRows, aFactor * aCols);
      ASSERT_TRUE(fdfFftPlan(aFactor * aRows, aFactor * aCols, ETLRXFftDirection::INVERSE).execute(aPadded.data()));
      CDftZoom aZoom(aRows, aCols, 1.0 / aFactor, aHalf);
      std::vector<TLRXComplex> aOut(size_t(aZoom.side() * aZoom.side()));
      for (const auto &aCentre : {std::pair<int, int>{0, 0}, {-3, 7}, {5, -6}, {aRows - 1, 1}}) {
        aZoom.evaluate(aSpectrum.data(), aCentre.first, aCentre.second, aOut.data());
        for (int i = -aHalf; i <= aHalf; ++i)
          for (int j = -aHalf; j <= aHalf; ++j) {
            const int aR = ((aCentre.first * aFactor + i) % (aFactor * aRows) + aFactor * aRows) % (aFactor * aRows);
            const int aC = ((aCentre.second * aFactor + j) % (aFactor * aCols) + aFactor * aCols) % (aFactor * aCols);
            ASSERT_LT(std::abs(aOut[size_t((i + aHalf) * aZoom.side() + j + aHalf)] -
                               aPadded[size_t(aR * aFactor * aCols + aC)]),
                      1e-3f)
                << aRows << "x" << aCols << " centre " << aCentre.first << "," << aCentre.second << " at " << i << "," << j;
          }
      }
      // A real signal stays real through the padding (the Nyquist split).
      CFftBuffer aReal(size_t(aRows * aCols));
      for (size_t k = 0; k < aReal.size(); ++k)
        aReal[k] = TLRXComplex(std::real(aSpectrum[k]), 0.0f);
      ASSERT_TRUE(fdfFftPlan(aRows, aCols, ETLRXFftDirection::FORWARD).execute(aReal.data()));
      fdfZeroPadSpectrum(aReal.data(), aRows, aCols, aPadded.data(), aFactor * aRows, aFactor * aCols);
      ASSERT_TRUE(fdfFftPlan(aFactor * aRows, aFactor * aCols, ETLRXFftDirection::INVERSE).execute(aPadded.data()));
      for (size_t k = 0; k < aPadded.size(); ++k)
        ASSERT_LT(std::fabs(aPadded[k].imag()), 1e-3f) << k;
    }
}
