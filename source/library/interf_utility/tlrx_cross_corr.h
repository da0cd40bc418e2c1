// Shift of one window pair: the cross-correlation core of the co-registration.
//
// Amplitude mode (coarse and fine stages): both complex windows are
// oversampled by 2 through their spectra (amplitude detection of data
// sampled near its bandwidth aliases, and the aliasing biases the sub-pixel
// peak by up to a fifth of a pixel), their amplitudes taken, the means
// removed by zeroing the zero frequency of the cross-spectrum M conj(S), and
// the integer-lag surface c = IFFT(M conj(S)) searched for its largest |c|^2
// (the first in row-major order on ties). Coherent mode (coherence-based
// fine stage): the same on the complex windows as they are, without the 2x.
//
// The sub-pixel peak is searched in steps of 1 / oversampling pixel within
// half a lag (and one step) of the integer peak, on the values that a zero-padded inverse transform
// would give there, evaluated by a small matrix DFT (CDftZoom).
//
// Measures: energy of a window sqrt(sum |w - mean|^2), correlation = |peak| /
// (cells x energy_m x energy_s), so identical windows correlate to 1; signal
// to noise = peak |c|^2 over the mean |c|^2 of the other integer lags (the
// surface's own mean is 0 once the zero frequency is removed). The shift is
// slave position - master position of the same content, in pixels.
#pragma once

#include <cstdint>
#include <vector>

#include "tlrx_fft.h"

enum class ETLRXPairFailure { NONE, EMPTY_WINDOW, ZERO_ENERGY, FORWARD_MASTER, FORWARD_SLAVE, BACKWARD };

struct STLRXWindowShift {
  ETLRXPairFailure mFailure = ETLRXPairFailure::NONE;
  double mRangeShift = 0.0;   // pixels
  double mAzimuthShift = 0.0; // lines
  double mCorrelation = 0.0;
  double mSnr = 0.0;
  bool valid() const { return mFailure == ETLRXPairFailure::NONE; }
};

class CCrossCorrelator {
public:
  // Windows of theLines x thePixels; theOversampling >= 1 sets the sub-pixel
  // step 1 / theOversampling. isValid() is false when a plan cannot be made.
  CCrossCorrelator(int32_t theLines, int32_t thePixels, int32_t theOversampling, bool theCoherent);
  bool isValid() const;

  // Shift of theSlave against theMaster (row-major, lines x pixels). A failing
  // transform writes its trace ("\n\nERROR: DURING FORWARD FFT OF MASTER :"
  // ...) and fails the pair, as does a window of zero energy.
  STLRXWindowShift estimate(const TLRXComplex *theMaster, const TLRXComplex *theSlave);

private:
  bool detect(const TLRXComplex *theWindow, CFftBuffer &theOut, double &theEnergy, bool theMaster);

  int32_t mLines;
  int32_t mPixels;
  int32_t mFactor; // 2 in amplitude mode, 1 in coherent mode
  int32_t mOversampling;
  bool mCoherent;
  const CFftPlan2D &mWindowForward;
  const CFftPlan2D &mForward; // on the correlation grid (mFactor x window)
  const CFftPlan2D &mInverse;
  CFftBuffer mChip;
  CFftBuffer mMaster;
  CFftBuffer mSlave;
  CDftZoom mZoom;
  std::vector<TLRXComplex> mZoomed;
};
