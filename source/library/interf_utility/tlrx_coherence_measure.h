// Interferometric coherence over a moving window, on plain buffers:
//   g = |sum z| / sqrt(sum m x sum s)
// with z the interferogram restored to the magnitude of master x conj(slave)
// (the normalised interferogram times sqrt(|m s|)) and m, s the master and
// slave powers. The window and its border rule are the exact R x K windows of
// tlrx_window_sums.h (border pixels are null).
//
// A pixel is invalid where m or s is no data (or not finite), or z is no data
// in both parts; its z counts as 0 + 0i. A window holding an invalid pixel,
// or a z of exactly 0 + 0i, gives the null value: one bad pixel invalidates
// every window it is in. A coherence at or above CTLRX_COHERENCE_MAX is stored
// as CTLRX_COHERENCE_MAX: coherence never exceeds 1, and a window of one
// image with itself is told apart from rounding above it.
#pragma once

#include <cmath>
#include <complex>
#include <cstdint>

constexpr float CTLRX_COHERENCE_MAX = 0.999f;

// Channels: m, s, Re z, Im z, invalid pixels.
constexpr int CTLRX_COHERENCE_CHANNELS = 5;

// How the inputs are read: amplitude power images are squared; the
// wide-swath switch uses every input as it is (no squaring, no restoration).
struct SCoherenceInputs {
  bool mWideSwath = false;
  bool mMasterAmplitude = false;
  bool mSlaveAmplitude = false;
};

// Prepares one line in place: theZ becomes the restored product (0 + 0i where
// the pixel is invalid), theM and theS the powers, theInvalid[j] 1 where the
// pixel invalidates its windows. theZValid, theMValid, theSValid: 1 where
// the raster's no-data test passed.
void fdfCoherencePrepare(std::complex<float> *theZ, const uint8_t *theZValid, float *theM, const uint8_t *theMValid,
                         float *theS, const uint8_t *theSValid, int32_t thePixels, const SCoherenceInputs &theInputs,
                         uint8_t *theInvalid);
// Terms of a prepared line for the window ring: m, s, Re z, Im z where the
// pixel is valid (0 elsewhere) and 1 in the invalid channel where it is not;
// every centre flag set (the ring clears the border's).
void fdfCoherenceTerms(const std::complex<float> *theZ, const float *theM, const float *theS,
                       const uint8_t *theInvalid, int32_t thePixels, double *const *theTerms, uint8_t *theCentre);
// The coherence of the window sums; theNull at a border pixel, where the
// window holds an invalid pixel, or where sum m x sum s is not positive.
void fdfCoherenceLine(const double *const *theSums, const uint8_t *theCentre, int32_t thePixels, float theNull,
                      float *theOut);
// The same from sums given directly (the local-frequency path): one square
// root, g^2 = |Z|^2 / (Pm Ps) compared with the cap squared.
inline float fdfCoherenceValue(double theMaster, double theSlave, double theRe, double theIm, float theNull) {
  const double aPowers = theMaster * theSlave;
  if (!(aPowers > 0.0))
    return theNull;
  const double aSquare = (theRe * theRe + theIm * theIm) / aPowers;
  const double aCap = CTLRX_COHERENCE_MAX;
  return aSquare >= aCap * aCap ? CTLRX_COHERENCE_MAX : static_cast<float>(std::sqrt(aSquare));
}

// Local fringe frequencies of a window from the unit-phasor differences of
// its pixels (range: neighbouring columns, azimuth: neighbouring lines) and
// their angles, K of each: f = (mean of the K angles + angle of the mean
// difference) / 2, in radians per pixel. Lines theLines, columns
// theFirstColumn .. theFirstColumn + theColumns - 1 of the arrays. False when
// a difference is 0 + 0i (a pixel of the window or its neighbour invalid).
struct SPhaseDifferences {
  const std::complex<float> *const *mDiffs;
  const float *const *mAngles;
};
bool fdfLocalFrequency(const SPhaseDifferences &theRange, const SPhaseDifferences &theAzimuth,
                       int32_t theFirstColumn, int32_t theColumns, int32_t theLines, double &theRangeFrequency,
                       double &theAzimuthFrequency);
// Unit-phasor differences u[j] conj(u[j - 1]) of a line (theRange) and u[j]
// conj(v[j]) against the previous line v (theAzimuth, 0 without one), with
// u = z / |z| (0 where z is 0), and their angles.
void fdfPhaseDifferences(const std::complex<float> *theLine, const std::complex<float> *thePrevious,
                         int32_t thePixels, std::complex<float> *theRange, float *theRangeAngles,
                         std::complex<float> *theAzimuth, float *theAzimuthAngles);
