// Common-band filtering of a single-look complex pair and the range
// oversampling of the interferogram, as pure functions on lines.
//
// Range: master and slave see the ground reflectivity through range bands
// moved by the spectral shift, which shows as the fringe frequency f (cycles
// per pixel) of master x conj(slave). Keeping only the part of each band that
// the other shares (width b - |f|, b the bandwidth over the sampling rate)
// removes the geometric decorrelation 1 - |f| / b. The fringe frequency is
// the peak of the interferogram's range power spectrum summed over a group of
// lines, accepted when N peak / (total - peak) exceeds CTLRX_FRINGE_MIN_SNR.
// Sign: for f > 0 the master keeps the upper end of its band [f - b/2, b/2]
// and the slave the lower end [-b/2, b/2 - f] (the slave sees the ground
// reflectivity frequency r at r - f relative to the master).
//
// Azimuth: two images with Doppler centroids fm and fs and processed
// bandwidth b (all in cycles per line) share the band of width b - |fm - fs|
// centred at (fm + fs) / 2; a band-pass FIR along azimuth keeps it in both.
#pragma once

#include <complex>
#include <cstdint>
#include <memory>
#include <vector>

#include "tlrx_fft.h"

// A pass band in cycles per input pixel, mLow < mHigh, within [-0.5, 0.5].
struct SRangeBand {
  double mLow = -0.5;
  double mHigh = 0.5;
};

// The common bands of master and slave for fringe frequency theFringe of
// master x conj(slave) and bandwidth theBandwidth (both cycles per pixel). A
// shift of at least the bandwidth leaves nothing in common: false.
bool fdfCommonRangeBands(double theFringe, double theBandwidth, SRangeBand &theMaster, SRangeBand &theSlave);

// One line at a time: forward FFT of thePixels, optional band-pass (cells
// whose frequency lies outside the band set to 0, the band edges kept), zero
// padding to theFactor x thePixels (Nyquist bin split as fdfZeroPadSpectrum
// does) and inverse FFT, scaled so that a sample's amplitude is kept: the
// values at output k x theFactor are the input values when no band is given.
class CRangeOversampler {
public:
  CRangeOversampler(int32_t thePixels, int32_t theFactor);
  int32_t outPixels() const { return mPixels * mFactor; }
  // theBand nullptr: the whole band.
  void process(const TLRXComplex *theIn, const SRangeBand *theBand, TLRXComplex *theOut);

private:
  int32_t mPixels;
  int32_t mFactor;
  CFftBuffer mSpectrum;
  CFftBuffer mPadded;
  const CFftPlan2D *mForward;
  const CFftPlan2D *mInverse;
};

constexpr double CTLRX_FRINGE_MIN_SNR = 5.0;

// Fringe frequency of master x conj(slave) from the power spectrum of the
// products of the lines added, at the input sampling: its peak bin refined
// with the larger neighbour, after the mean noise level is taken off, by the
// ratio of the amplitudes r = |X(k+-1)| / |X(k)|, offset r / (1 + r) bin,
// which is exact for a tone over the whole line. Cells where either input is
// 0 + 0i add nothing.
class CFringeEstimator {
public:
  explicit CFringeEstimator(int32_t thePixels);
  void reset();
  void add(const TLRXComplex *theMaster, const TLRXComplex *theSlave);
  // False (theFringe 0) when no line was added or the SNR is below the
  // minimum; theSnr is N peak / (total - peak) with the peak the three bins
  // around the maximum.
  bool result(double &theFringe, double &theSnr) const;

private:
  int32_t mPixels;
  int32_t mLinesAdded = 0;
  const CFftPlan2D *mPlan = nullptr;
  CFftBuffer mLine;
  std::vector<double> mPower;
};

// Fringe frequency (cycles per pixel) of a phase line in radians: the mean of
// the wrapped differences of neighbouring pixels over 2 pi. Null cells
// (theNull, NaN) and their neighbours are skipped; 0 when none is left.
double fdfFringeFromPhase(const float *thePhase, int32_t thePixels, double theNull);

// Band-pass FIR along azimuth to the common band of master and slave:
// CTLRX_AZIMUTH_FILTER_TAPS lines centred on the output line, a
// Kaiser-windowed (beta CTLRX_AZIMUTH_KAISER_BETA) low-pass of each column's
// common width shifted to its common centre, unit gain at that centre. Lines
// outside the image count as 0.
constexpr int32_t CTLRX_AZIMUTH_FILTER_TAPS = 33;
constexpr double CTLRX_AZIMUTH_KAISER_BETA = 5.0;

class CAzimuthBandFilter {
public:
  // Centroids per column in cycles per line (sizes thePixels, else
  // CTLRX_ERR_SIZE_MISMATCH), taken as given, not modulo 1, bandwidth
  // theBandwidth in cycles per line (AzimuthBandwidth / PRF). The common width
  // never falls below 0.05 of the line rate.
  CAzimuthBandFilter(int32_t thePixels, const std::vector<double> &theMasterCentroid,
                     const std::vector<double> &theSlaveCentroid, double theBandwidth);
  // theLines[k] is input line theLine - half + k (half = taps / 2), nullptr
  // for a line outside the image; theOut receives filtered line theLine.
  void filterLine(const TLRXComplex *const *theLines, int32_t theLine, TLRXComplex *theOut) const;

private:
  int32_t mPixels;
  int32_t mHalf;
  // Tap pairs j and -j folded: tap j of column c is mCos[j][c] + i mSin[j][c]
  // (the low-pass times e^(2 pi i centre j)), that of -j its conjugate, so a
  // pair costs a_j (u_j + u_-j) + i b_j (u_j - u_-j). Rows j = 0..half, each
  // thePixels wide.
  std::vector<float> mCos;
  std::vector<float> mSin;
  std::vector<TLRXComplex> mZeros; // stands for the lines outside the image
};
