// Per-line formulas of the window measures, on plain buffers: how an input
// line becomes the terms a CWindowRing sums, and how the window sums become an
// output line. The window and its edges are those of tlrx_window_sums.h.
//
// No-data policy shared by all: an input pixel counts only when the raster's
// no-data test passed (mask 1) and its value, after conversion, is finite. A
// NaN or infinity would otherwise enter the running sums and spoil every
// window it passes through, long after it left.
#pragma once

#include <cstdint>

// ----------------------------------------------------------------- texture
// Channels: amplitude, squared amplitude, count.
constexpr int CTLRX_TEXTURE_CHANNELS = 3;

// a = v, or sqrt(|v|) for an intensity (power) input; terms a, a^2, 1 where
// the pixel counts, 0 elsewhere; theCentre[j] = whether pixel j counts.
void fdfTextureTerms(const double *theValues, const int32_t *theMask, int32_t thePixels, bool thePowerInput,
                     double *const *theTerms, uint8_t *theCentre);
// Coefficient of variation sqrt(q - m^2) / m with m = S1 / n, q = S2 / n over
// the window; theNull where the pixel itself does not count, the window has
// no valid pixel or its mean is not positive.
void fdfTextureLine(const double *const *theSums, const uint8_t *theCentre, int32_t thePixels, float theNull,
                    float *theOut);

// ----------------------------------------------------------- normalisation
// Channels: intensity 1, count 1, intensity 2, count 2.
constexpr int CTLRX_NORMALIZE_CHANNELS = 4;

// Intensity of an input line: v^2 unless the input already holds intensity.
inline double fdfIntensity(double theValue, bool thePowerInput) {
  return thePowerInput ? theValue : theValue * theValue;
}

// Terms I1, 1 (where input 1 counts), I2, 1 (where input 2 counts);
// theCentre[j] = both inputs count at j.
void fdfNormalizeTerms(const double *theValues1, const int32_t *theMask1, bool thePower1, const double *theValues2,
                       const int32_t *theMask2, bool thePower2, int32_t thePixels, double *const *theTerms,
                       uint8_t *theCentre);
// (S1 / n1 + S2 / n2) / 2, the mean of the two local mean intensities;
// theNull where a centre input does not count or a window holds no valid
// pixel of one input. Returns the number of computed pixels.
int64_t fdfNormalizeLine(const double *const *theSums, const uint8_t *theCentre, int32_t thePixels, float theNull,
                         float *theOut);

// ------------------------------------------------------ intensity coherence
// Channels: x1 x2, x1^2, x2^2.
constexpr int CTLRX_CORRELATION_CHANNELS = 3;

// Counts of the computed correlations and of the coherence classes.
struct SCorrelationStats {
  int64_t mComputed = 0; // every computed r
  int64_t mAbove08 = 0;  // g > 0.8
  int64_t mAbove07 = 0;  // 0.7 < g <= 0.8
  int64_t mAbove05 = 0;  // 0.5 < g <= 0.7
  int64_t mAbove0 = 0;   // 0 < g <= 0.5 (r > 0.5 only; r <= 0.5 is in no class)

  SCorrelationStats &operator+=(const SCorrelationStats &theOther) {
    mComputed += theOther.mComputed;
    mAbove08 += theOther.mAbove08;
    mAbove07 += theOther.mAbove07;
    mAbove05 += theOther.mAbove05;
    mAbove0 += theOther.mAbove0;
    return *this;
  }
};

// x = I / n with n the normalisation value; a pixel counts where both inputs
// and n are valid and n is not 0. Terms x1 x2, x1^2, x2^2 where it counts.
void fdfCorrelationTerms(const double *theValues1, const int32_t *theMask1, bool thePower1,
                         const double *theValues2, const int32_t *theMask2, bool thePower2, const double *theNorm,
                         const int32_t *theNormMask, int32_t thePixels, double *const *theTerms, uint8_t *theCentre);
// r = X / sqrt(A B), g = sqrt(2 r - 1) for r > 0.5, else 0; theNull where
// the pixel does not count or A B is not positive.
void fdfCorrelationLine(const double *const *theSums, const uint8_t *theCentre, int32_t thePixels, float theNull,
                        float *theOut, SCorrelationStats &theStats);
