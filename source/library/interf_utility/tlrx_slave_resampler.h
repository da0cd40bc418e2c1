// The slave of a pair resampled onto the master grid, line by line.
//
// Two passes with the tabulated sinc (tlrx_sinc_table.h): each slave line is
// first interpolated in range at the slave columns of the master pixels, then
// the range-resampled lines are interpolated in azimuth at the slave line of
// each master pixel. Both positions come from a shift field evaluated per
// master pixel. The range pass of slave line j takes the range shift of the
// master line that sees it, y = j - dAz (first order): the cross term
// d(dRange)/dy is then honoured to within |d(dRange)/dy| x 4 lines of kernel
// reach, below 1e-3 pixel for the smooth fields co-registration gives.
//
// Azimuth spectra centred away from zero frequency (a Doppler centroid f, in
// cycles per line) are moved to zero before the azimuth pass and back after:
// every range-resampled line j is multiplied by e^(-2 pi i f j) as it enters,
// the interpolated value at slave line p by e^(+2 pi i f p). Phases use the
// absolute line number, so the result does not depend on which lines were
// read together.
#pragma once

#include <complex>
#include <cstdint>
#include <deque>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "tlrx_sinc_table.h"

class CRasterFile;

// Where the slave sees each master pixel.
class CShiftField {
public:
  virtual ~CShiftField() = default;
  // Slave columns and lines of master line theLine, pixels 0 .. count - 1.
  virtual void masterLine(int32_t theLine, int32_t theCount, double *theColumns, double *theLines) = 0;
  // The slave columns at which slave line theSlaveLine is resampled in range
  // for master pixels 0 .. count - 1.
  virtual void slaveLineColumns(int32_t theSlaveLine, int32_t theCount, double *theColumns) = 0;
};

// Shifts (slave - master) as polynomials of the master position, the form of
// fdfCoregPolyValue: column = x + dR(x, y), line = y + dA(x, y). The range
// pass of slave line j takes master line j + dAInv(x, j) when the inverse
// azimuth polynomial (master - slave, of the slave position) is given, else
// j - dA(x, j).
class CPolynomialShiftField : public CShiftField {
public:
  CPolynomialShiftField(std::vector<double> theRange, std::vector<double> theAzimuth,
                        std::vector<double> theAzimuthInverse = {});
  void masterLine(int32_t theLine, int32_t theCount, double *theColumns, double *theLines) override;
  void slaveLineColumns(int32_t theSlaveLine, int32_t theCount, double *theColumns) override;

private:
  std::vector<double> mRange;
  std::vector<double> mAzimuth;
  std::vector<double> mAzimuthInverse;
};

// Shifts (slave - master, pixels) read from two FLOAT rasters on the master
// grid. A null cell or a line outside the raster counts as no shift. The range
// pass of slave line j takes line j of the range raster (clamped to it).
class CRasterShiftField : public CShiftField {
public:
  // Opens both rasters (their headers: name + "_hdr"); raises 261122 for a
  // missing header and 652807 when a size differs from the master's.
  CRasterShiftField(const std::string &theRange, const std::string &theAzimuth, int32_t theLines,
                    int32_t thePixels);
  ~CRasterShiftField() override;
  void masterLine(int32_t theLine, int32_t theCount, double *theColumns, double *theLines) override;
  void slaveLineColumns(int32_t theSlaveLine, int32_t theCount, double *theColumns) override;

private:
  struct SImpl;
  std::unique_ptr<SImpl> mImpl;
};

// The two passes as functions of the lines they are given, for callers that
// hold and schedule the lines themselves: the range pass of one slave line and
// the azimuth pass of one master line over range-passed slave lines. Each
// result depends only on its line numbers and inputs, so lines may be computed
// in any order and at the same time, each call with its own scratch.
struct SResampleScratch {
  std::vector<double> mFractions;                // azimuth fraction per master pixel
  std::vector<double> mCycles;                   // phases in cycles, one line
  std::vector<int64_t> mFirstTap;                // floor of the slave line, per master pixel
  std::vector<const std::complex<float> *> mTaps; // lines of the azimuth window
};

class CResampleKernel {
public:
  // Returns slave line theLine (range-passed) of the window being resampled.
  using TSlaveLine = std::function<const std::complex<float> *(int32_t theLine)>;

  // theCentroid: Doppler centroid per master column in cycles per line
  // (empty: zero everywhere; another size than theMasterPixels raises 652807).
  CResampleKernel(int32_t theSlaveLines, int32_t theSlavePixels, int32_t theMasterPixels,
                  std::vector<double> theCentroid, double theOversampling = 1.2);

  int32_t slaveLines() const { return mSlaveLines; }
  int32_t slavePixels() const { return mSlavePixels; }
  int32_t masterPixels() const { return mMasterPixels; }

  // Raw slave line theLine (slave pixels) interpolated at theColumns (one
  // per master pixel) into theOut (master pixels), demodulated by the
  // centroid at its absolute line number.
  void rangePass(int32_t theLine, const std::complex<float> *theRaw, const double *theColumns,
                 std::complex<float> *theOut, SResampleScratch &theScratch) const;

  // The slave lines [theFirst, theLast] whose taps the azimuth pass of a
  // master line with slave positions theColumns, theLines (master pixels)
  // reaches, lines outside the slave included; false when no pixel lies
  // inside the slave.
  bool window(const double *theColumns, const double *theLines, int64_t &theFirst, int64_t &theLast) const;

  // Raises 456962 naming master line theMasterLine when window [theFirst,
  // theLast] spans more than theMaxHeld lines.
  static void checkReach(int32_t theMasterLine, int64_t theFirst, int64_t theLast, int32_t theMaxHeld);

  // The resampled slave at a master line into theOut (master pixels): the
  // azimuth interpolation of the range-passed lines of its window inside the
  // slave (theSlaveLine), remodulated. A pixel whose position lies outside
  // the slave is 0 + 0i; taps outside it count as 0.
  void azimuthPass(const double *theColumns, const double *theLines, const TSlaveLine &theSlaveLine,
                   std::complex<float> *theOut, SResampleScratch &theScratch) const;

private:
  void prepare(SResampleScratch &theScratch) const;

  int32_t mSlaveLines;
  int32_t mSlavePixels;
  int32_t mMasterPixels;
  std::vector<double> mCentroid;
  bool mDoppler = false;                   // some centroid is not zero
  CSincTable mTable;
  std::vector<std::complex<float>> mZeros; // a line outside the slave
};

class CSlaveResampler {
public:
  // Reads slave line theLine (0 .. slave lines - 1) into theCells.
  using TLineReader = std::function<void(int32_t theLine, std::complex<float> *theCells)>;

  // theCentroid: Doppler centroid per master column in cycles per line
  // (empty: zero everywhere). theOversampling: sampling rate over bandwidth
  // of the kernel (see CSincTable).
  CSlaveResampler(int32_t theSlaveLines, int32_t theSlavePixels, int32_t theMasterPixels, CShiftField &theField,
                  std::vector<double> theCentroid, TLineReader theReader, double theOversampling = 1.2);

  // Master line theLine of the resampled slave into theOut (master pixels).
  // Lines are asked in increasing order; slave lines no longer needed are
  // dropped, so memory follows the spread of the azimuth shift, not the
  // image. A master pixel whose slave position lies outside the slave image
  // is 0 + 0i; kernel taps outside it count as 0.
  void resampleLine(int32_t theLine, std::complex<float> *theOut);

  // At most theLines slave lines are held: a master line whose shifts reach
  // over more (a field that is no co-registration) raises 456962 instead of
  // holding a large part of the image.
  void setMaxHeld(int32_t theLines) { mMaxHeld = theLines; }

  int64_t linesRead() const { return mLinesRead; }
  size_t linesHeld() const { return mHeld.size(); }

private:
  void hold(int32_t theFirst, int32_t theLast);
  // Range pass of one slave line into theOut (master pixels), demodulated.
  void rangePass(int32_t theLine, std::vector<std::complex<float>> &theOut);

  CResampleKernel mKernel;
  CShiftField &mField;
  TLineReader mReader;
  SResampleScratch mScratch;
  int32_t mFirstHeld = 0;  // absolute slave line of mHeld.front()
  std::deque<std::vector<std::complex<float>>> mHeld; // range-resampled, demodulated
  std::vector<std::vector<std::complex<float>>> mSpare;
  std::vector<std::complex<float>> mRaw;
  std::vector<double> mColumns, mLines, mRangeColumns;
  int64_t mLinesRead = 0;
  int32_t mMaxHeld = INT32_MAX;
};

// Doppler centroid per master column (cycles per line, in [-0.5, 0.5)) from
// "ChannelInfo.DopplerCentroidCoeff" (hertz, a polynomial of the two-way
// range time t = "RangeTimeFirstPixel" + column / "RangeSamplingRate") over
// "PulseRepetitionFrequency". False, theCentroid untouched, when one of
// these fields is missing or the rate or frequency is not positive.
class CDescription;
bool fdfDopplerFromHeader(const CDescription &theHeader, int32_t thePixels, std::vector<double> &theCentroid);

// Doppler centroid estimated from the data with the correlation Doppler
// estimator, f = arg(sum s(n + 1) conj(s(n))) / 2 pi along azimuth, summed over
// up to CTLRX_DOPPLER_PAIRS pairs of consecutive lines spread evenly over the
// image, per band of CTLRX_DOPPLER_BAND columns, then fitted by a straight
// line in the column (band angles unwrapped from the image centre). Only
// valid cells (not both parts 0) count. Zero when nothing counts.
constexpr int32_t CTLRX_DOPPLER_PAIRS = 64;
constexpr int32_t CTLRX_DOPPLER_BAND = 128;
std::vector<double> fdfEstimateDoppler(const CSlaveResampler::TLineReader &theReader, int32_t theLines,
                                       int32_t thePixels);
