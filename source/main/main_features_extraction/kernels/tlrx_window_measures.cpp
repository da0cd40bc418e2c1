#include "tlrx_window_measures.h"

#include <cmath>

namespace {

inline bool fdfCounts(int32_t theMask, double theValue) { return theMask != 0 && std::isfinite(theValue); }

} // namespace

// Texture terms. Input: one line of values with the raster's validity mask.
// Amplitude a = v, or sqrt(|v|) when the input holds intensity (power).
// No data: a pixel counts when its mask is 1 and a is finite; a pixel that
// does not count adds 0 to every channel, so the window sums hold the valid
// pixels only and the count channel says how many there are.
void fdfTextureTerms(const double *theValues, const int32_t *theMask, int32_t thePixels, bool thePowerInput,
                     double *const *theTerms, uint8_t *theCentre) {
  double *aSum = theTerms[0];
  double *aSquares = theTerms[1];
  double *aCount = theTerms[2];
  for (int32_t j = 0; j < thePixels; ++j) {
    const double aAmplitude = thePowerInput ? std::sqrt(std::fabs(theValues[j])) : theValues[j];
    const bool aCounts = fdfCounts(theMask[j], aAmplitude);
    aSum[j] = aCounts ? aAmplitude : 0.0;
    aSquares[j] = aCounts ? aAmplitude * aAmplitude : 0.0;
    aCount[j] = aCounts ? 1.0 : 0.0;
    theCentre[j] = aCounts ? 1 : 0;
  }
}

// Texture: coefficient of variation of the amplitudes in the window,
//   m = S1 / n, q = S2 / n, out = sqrt(q - m^2) / m = sqrt(n S2 / S1^2 - 1),
// with S1, S2, n the window sums of a, a^2 and the valid count (window and
// edges: tlrx_window_sums.h); the second form costs one division and one
// square root per pixel. No data: out = theNull where the pixel itself is not
// valid (whatever its window holds), where n = 0, or where S1 <= 0 (no
// division by a zero or negative mean). The variance is that of the
// population; rounding can push it a hair below 0 for a constant window,
// which is clamped to 0 so a homogeneous area gives 0 instead of NaN.
void fdfTextureLine(const double *const *theSums, const uint8_t *theCentre, int32_t thePixels, float theNull,
                    float *theOut) {
  const double *aSum = theSums[0];
  const double *aSquares = theSums[1];
  const double *aCount = theSums[2];
  for (int32_t j = 0; j < thePixels; ++j) {
    if (theCentre[j] == 0 || !(aSum[j] > 0.0) || !(aCount[j] > 0.0)) {
      theOut[j] = theNull;
      continue;
    }
    const double aRelativeVariance = aCount[j] * aSquares[j] / (aSum[j] * aSum[j]) - 1.0;
    theOut[j] = static_cast<float>(std::sqrt(aRelativeVariance > 0.0 ? aRelativeVariance : 0.0));
  }
}

// Normalisation terms. Intensity I = v^2, or v when the input holds intensity.
// No data: each input counts on its own where its mask is 1 and I is finite;
// the centre flag needs both, as the output pixel is defined only there.
void fdfNormalizeTerms(const double *theValues1, const int32_t *theMask1, bool thePower1, const double *theValues2,
                       const int32_t *theMask2, bool thePower2, int32_t thePixels, double *const *theTerms,
                       uint8_t *theCentre) {
  for (int32_t j = 0; j < thePixels; ++j) {
    const double aI1 = fdfIntensity(theValues1[j], thePower1);
    const double aI2 = fdfIntensity(theValues2[j], thePower2);
    const bool aCounts1 = fdfCounts(theMask1[j], aI1);
    const bool aCounts2 = fdfCounts(theMask2[j], aI2);
    theTerms[0][j] = aCounts1 ? aI1 : 0.0;
    theTerms[1][j] = aCounts1 ? 1.0 : 0.0;
    theTerms[2][j] = aCounts2 ? aI2 : 0.0;
    theTerms[3][j] = aCounts2 ? 1.0 : 0.0;
    theCentre[j] = aCounts1 && aCounts2 ? 1 : 0;
  }
}

// Normalisation: out = (S1 / n1 + S2 / n2) / 2, the average of the two local
// mean intensities over the window (each mean over that input's valid pixels).
// No data: theNull where either input is not valid at the pixel or a window
// holds no valid pixel of one input.
int64_t fdfNormalizeLine(const double *const *theSums, const uint8_t *theCentre, int32_t thePixels, float theNull,
                         float *theOut) {
  int64_t aComputed = 0;
  for (int32_t j = 0; j < thePixels; ++j) {
    const double aN1 = theSums[1][j];
    const double aN2 = theSums[3][j];
    if (theCentre[j] == 0 || !(aN1 > 0.0) || !(aN2 > 0.0)) {
      theOut[j] = theNull;
      continue;
    }
    theOut[j] = static_cast<float>((theSums[0][j] / aN1 + theSums[2][j] / aN2) / 2.0);
    ++aComputed;
  }
  return aComputed;
}

// Correlation terms. x1 = I1 / n, x2 = I2 / n, with n the normalisation value
// of the pixel. No data: a pixel counts only where input 1, input 2 and n are
// all valid, n is not 0 and both quotients are finite; it then adds x1 x2,
// x1^2 and x2^2. The squares are taken over the same pixels as the cross
// product: sums of squares over pixels missing from the other image would
// pull r below 1 even for two identical images.
void fdfCorrelationTerms(const double *theValues1, const int32_t *theMask1, bool thePower1,
                         const double *theValues2, const int32_t *theMask2, bool thePower2, const double *theNorm,
                         const int32_t *theNormMask, int32_t thePixels, double *const *theTerms, uint8_t *theCentre) {
  for (int32_t j = 0; j < thePixels; ++j) {
    const bool aNormValid = theNormMask[j] != 0 && theNorm[j] != 0.0 && std::isfinite(theNorm[j]);
    const double aX1 = aNormValid ? fdfIntensity(theValues1[j], thePower1) / theNorm[j] : 0.0;
    const double aX2 = aNormValid ? fdfIntensity(theValues2[j], thePower2) / theNorm[j] : 0.0;
    const bool aCounts = aNormValid && fdfCounts(theMask1[j], aX1) && fdfCounts(theMask2[j], aX2);
    theTerms[0][j] = aCounts ? aX1 * aX2 : 0.0;
    theTerms[1][j] = aCounts ? aX1 * aX1 : 0.0;
    theTerms[2][j] = aCounts ? aX2 * aX2 : 0.0;
    theCentre[j] = aCounts ? 1 : 0;
  }
}

// Intensity coherence: r = X / sqrt(A B) with X, A, B the window sums of
// x1 x2, x1^2, x2^2, and g = sqrt(2 r - 1) for r > 0.5, else exactly 0.
// For circular Gaussian speckle E[I1 I2] = <I1><I2> (1 + |gamma|^2) and
// E[I^2] = 2 <I>^2, so r tends to (1 + |gamma|^2) / 2 and g to |gamma|. Over a
// finite window r is a ratio estimate slightly biased upwards and noisy, and
// values at or below 0.5 are cut to 0: low coherences come out too high
// (independent images give a mean g near 0.15 with 11 x 11 windows), while
// above about 0.3 the concave square root offsets the bias of r.
// No data: theNull where the pixel itself does not count or A B is not
// positive (an empty or all-zero window). A B cannot overflow: x <= 2 n1
// since the normalisation value is at least I / (2 n1).
// The class counts are sums of comparisons rather than branches: g is as
// random as the speckle, so branches on it would mostly be mispredicted.
void fdfCorrelationLine(const double *const *theSums, const uint8_t *theCentre, int32_t thePixels, float theNull,
                        float *theOut, SCorrelationStats &theStats) {
  int64_t aComputed = 0, aAbove08 = 0, aAbove07 = 0, aAbove05 = 0, aAbove0 = 0;
  for (int32_t j = 0; j < thePixels; ++j) {
    const double aQ = theSums[1][j] * theSums[2][j];
    if (theCentre[j] == 0 || !(aQ > 0.0)) {
      theOut[j] = theNull;
      continue;
    }
    const double aR = theSums[0][j] / std::sqrt(aQ);
    const bool aCoherent = aR > 0.5;
    const double aG = aCoherent ? std::sqrt(2.0 * aR - 1.0) : 0.0;
    theOut[j] = static_cast<float>(aG);
    ++aComputed;
    aAbove08 += aG > 0.8;
    aAbove07 += (aG > 0.7) & (aG <= 0.8);
    aAbove05 += (aG > 0.5) & (aG <= 0.7);
    aAbove0 += aCoherent & (aG <= 0.5);
  }
  theStats.mComputed += aComputed;
  theStats.mAbove08 += aAbove08;
  theStats.mAbove07 += aAbove07;
  theStats.mAbove05 += aAbove05;
  theStats.mAbove0 += aAbove0;
}
