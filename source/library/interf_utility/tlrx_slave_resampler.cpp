// Slave resampler, shift fields and Doppler centroids (see
// tlrx_slave_resampler.h). The resampler keeps a window of range-resampled,
// demodulated slave lines in a deque: each slave line is read and range
// resampled once, when the first master line needs it, and dropped when the
// window has moved past it.
#include "tlrx_slave_resampler.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <utility>

#include "tlrx_description_section.h"
#include "tlrx_errors.h"
#include "tlrx_raster_file.h"
#include "tlrx_step_common.h"

namespace {

constexpr double CTLRX_RS_TWO_PI = 6.28318530717958647692;
// Adding and subtracting 1.5 x 2^52 rounds a double below 2^51 to the nearest
// integer without a library call, so the phasor loops vectorise.
constexpr double CTLRX_RS_ROUNDER = 6755399441055744.0;

// Multiplies theLine by e^(2 pi i t), t = theCycles[c]. t is reduced modulo 1
// in double before any angle is formed; sine and cosine are polynomials on a
// quarter turn.
void multiplyByTurns(std::complex<float> *theLine, const double *theCycles, int32_t theCount) {
  for (int32_t c = 0; c < theCount; ++c) {
    const double aT = theCycles[c] - ((theCycles[c] + CTLRX_RS_ROUNDER) - CTLRX_RS_ROUNDER); // [-0.5, 0.5]
    const double aHalf = (2.0 * aT + CTLRX_RS_ROUNDER) - CTLRX_RS_ROUNDER;                    // -1, 0 or 1
    const double aSign = 1.0 - 2.0 * aHalf * aHalf; // a half turn flips both parts
    // The reduced angle is within a quarter turn: float polynomials suffice
    // for float data (error below 2e-7).
    const float x = static_cast<float>(CTLRX_RS_TWO_PI * (aT - 0.5 * aHalf)), x2 = x * x;
    const float aSin =
        x * (1.0f + x2 * (-1.0f / 6 + x2 * (1.0f / 120 + x2 * (-1.0f / 5040 + x2 * (1.0f / 362880 - x2 / 39916800)))));
    const float aCos =
        1.0f + x2 * (-0.5f + x2 * (1.0f / 24 + x2 * (-1.0f / 720 + x2 * (1.0f / 40320 + x2 * (-1.0f / 3628800)))));
    const float aRe = static_cast<float>(aSign) * aCos, aIm = static_cast<float>(aSign) * aSin;
    const float aA = theLine[c].real(), aB = theLine[c].imag();
    theLine[c] = std::complex<float>(aA * aRe - aB * aIm, aA * aIm + aB * aRe);
  }
}

// Coefficients of a shift polynomial (terms 1, x, y, x^2, x y, y^2) on line y
// as a quadratic in x: a0 + a1 x + a2 x^2.
struct SQuadratic {
  double mA0 = 0.0, mA1 = 0.0, mA2 = 0.0;
};
SQuadratic alongLine(const std::vector<double> &theCoeffs, double theY) {
  double c[6] = {0, 0, 0, 0, 0, 0};
  for (size_t i = 0; i < theCoeffs.size() && i < 6; ++i)
    c[i] = theCoeffs[i];
  return {c[0] + theY * (c[2] + theY * c[5]), c[1] + c[4] * theY, c[3]};
}
double polyValue(const std::vector<double> &theCoeffs, double theX, double theY) {
  const SQuadratic q = alongLine(theCoeffs, theY);
  return q.mA0 + theX * (q.mA1 + theX * q.mA2);
}

// x - round(x), in [-0.5, 0.5).
double wrapCycles(double theCycles) { return theCycles - std::floor(theCycles + 0.5); }

} // namespace

// ------------------------------------------------------------ shift fields

CPolynomialShiftField::CPolynomialShiftField(std::vector<double> theRange, std::vector<double> theAzimuth,
                                             std::vector<double> theAzimuthInverse)
    : mRange(std::move(theRange)), mAzimuth(std::move(theAzimuth)), mAzimuthInverse(std::move(theAzimuthInverse)) {}

void CPolynomialShiftField::masterLine(int32_t theLine, int32_t theCount, double *theColumns, double *theLines) {
  const double y = theLine;
  const SQuadratic r = alongLine(mRange, y), a = alongLine(mAzimuth, y);
  for (int32_t i = 0; i < theCount; ++i) {
    const double x = i;
    theColumns[i] = x + r.mA0 + x * (r.mA1 + x * r.mA2);
    theLines[i] = y + a.mA0 + x * (a.mA1 + x * a.mA2);
  }
}

void CPolynomialShiftField::slaveLineColumns(int32_t theSlaveLine, int32_t theCount, double *theColumns) {
  const double j = theSlaveLine;
  // The master line that sees slave line j: by the inverse polynomial (of the
  // slave position, taken at column x), else by the forward one to first order.
  const bool aInverse = !mAzimuthInverse.empty();
  const SQuadratic a = alongLine(aInverse ? mAzimuthInverse : mAzimuth, j);
  for (int32_t i = 0; i < theCount; ++i) {
    const double x = i;
    const double aShift = a.mA0 + x * (a.mA1 + x * a.mA2);
    const double y = aInverse ? j + aShift : j - aShift;
    theColumns[i] = x + polyValue(mRange, x, y);
  }
}

struct CRasterShiftField::SImpl {
  struct SRaster {
    CRasterFile mFile;
    SNoData mNoData;
    std::vector<float> mLine;
    int32_t mCached = -1;
  };
  SRaster mRange, mAzimuth;
  int32_t mLines = 0, mPixels = 0;

  // Shifts of raster line theLine, no data as 0; nullptr outside the raster.
  const float *line(SRaster &theRaster, int32_t theLine) {
    if (theLine < 0 || theLine >= mLines)
      return nullptr;
    if (theRaster.mCached != theLine) {
      theRaster.mFile.getLine(theRaster.mLine.data(), theLine);
      for (float &aValue : theRaster.mLine)
        aValue = theRaster.mNoData.isNullOrNaN(aValue) ? 0.0f : aValue;
      theRaster.mCached = theLine;
    }
    return theRaster.mLine.data();
  }
};

CRasterShiftField::CRasterShiftField(const std::string &theRange, const std::string &theAzimuth, int32_t theLines,
                                     int32_t thePixels)
    : mImpl(std::make_unique<SImpl>()) {
  mImpl->mLines = theLines;
  mImpl->mPixels = thePixels;
  const std::pair<const std::string *, SImpl::SRaster *> aRasters[] = {{&theRange, &mImpl->mRange},
                                                                       {&theAzimuth, &mImpl->mAzimuth}};
  for (const auto &aRaster : aRasters) {
    CDescription aHeader;
    fdfLoadInputHeader(*aRaster.first, aHeader);
    CRasterFile &aFile = aRaster.second->mFile;
    aFile.open_read(aRaster.first->c_str(), aHeader);
    if (aFile.getNrOfLinesPerImage() != theLines || aFile.getNrOfPixelsPerLine() != thePixels)
      TLRX_RAISE_F(CTLRX_ERR_SIZE_MISMATCH, "shift raster %.300s: %d lines x %d pixels, the master has %d x %d",
                   aRaster.first->c_str(), aFile.getNrOfLinesPerImage(), aFile.getNrOfPixelsPerLine(), theLines,
                   thePixels);
    aRaster.second->mNoData = aFile.getNoData();
    aRaster.second->mLine.assign(static_cast<size_t>(thePixels), 0.0f);
  }
}

CRasterShiftField::~CRasterShiftField() = default;

void CRasterShiftField::masterLine(int32_t theLine, int32_t theCount, double *theColumns, double *theLines) {
  const float *aRange = mImpl->line(mImpl->mRange, theLine);
  const float *aAzimuth = mImpl->line(mImpl->mAzimuth, theLine);
  for (int32_t i = 0; i < theCount; ++i) {
    const bool aInside = i < mImpl->mPixels;
    theColumns[i] = i + (aRange != nullptr && aInside ? aRange[i] : 0.0);
    theLines[i] = theLine + (aAzimuth != nullptr && aInside ? aAzimuth[i] : 0.0);
  }
}

void CRasterShiftField::slaveLineColumns(int32_t theSlaveLine, int32_t theCount, double *theColumns) {
  const float *aRange = mImpl->line(mImpl->mRange, std::clamp(theSlaveLine, 0, std::max(0, mImpl->mLines - 1)));
  for (int32_t i = 0; i < theCount; ++i)
    theColumns[i] = i + (aRange != nullptr && i < mImpl->mPixels ? aRange[i] : 0.0);
}

// ------------------------------------------------------------ kernel

CResampleKernel::CResampleKernel(int32_t theSlaveLines, int32_t theSlavePixels, int32_t theMasterPixels,
                                 std::vector<double> theCentroid, double theOversampling)
    : mSlaveLines(std::max(0, theSlaveLines)), mSlavePixels(std::max(0, theSlavePixels)),
      mMasterPixels(std::max(0, theMasterPixels)), mCentroid(std::move(theCentroid)), mTable(theOversampling) {
  if (!mCentroid.empty() && mCentroid.size() != static_cast<size_t>(mMasterPixels))
    TLRX_RAISE_F(CTLRX_ERR_SIZE_MISMATCH, "Doppler centroid of %zu columns for %d master pixels", mCentroid.size(),
                 mMasterPixels);
  mDoppler = std::any_of(mCentroid.begin(), mCentroid.end(), [](double f) { return f != 0.0; });
  mZeros.assign(static_cast<size_t>(mMasterPixels), std::complex<float>(0.0f, 0.0f));
}

void CResampleKernel::prepare(SResampleScratch &theScratch) const {
  const size_t aMaster = static_cast<size_t>(mMasterPixels);
  theScratch.mFractions.resize(aMaster);
  theScratch.mCycles.resize(aMaster);
  theScratch.mFirstTap.resize(aMaster);
}

void CResampleKernel::rangePass(int32_t theLine, const std::complex<float> *theRaw, const double *theColumns,
                                std::complex<float> *theOut, SResampleScratch &theScratch) const {
  fdfSincResampleLine(mTable, theRaw, mSlavePixels, theColumns, mMasterPixels, theOut);
  if (mDoppler) {
    prepare(theScratch);
    const double j = theLine;
    for (int32_t c = 0; c < mMasterPixels; ++c)
      theScratch.mCycles[static_cast<size_t>(c)] = -mCentroid[static_cast<size_t>(c)] * j;
    multiplyByTurns(theOut, theScratch.mCycles.data(), mMasterPixels);
  }
}

bool CResampleKernel::window(const double *theColumns, const double *theLines, int64_t &theFirst,
                             int64_t &theLast) const {
  const double aLastLine = double(mSlaveLines) - 1.0, aLastPixel = double(mSlavePixels) - 1.0;
  int64_t aLow = std::numeric_limits<int64_t>::max(), aHigh = std::numeric_limits<int64_t>::min();
  for (int32_t c = 0; c < mMasterPixels; ++c) {
    const double p = theLines[c], x = theColumns[c];
    if (!(p >= 0.0 && p <= aLastLine && x >= 0.0 && x <= aLastPixel))
      continue;
    int64_t aFirst = 0;
    double aFraction = 0.0;
    fdfSplitPosition(p, aFirst, aFraction);
    aLow = std::min(aLow, aFirst);
    aHigh = std::max(aHigh, aFirst);
  }
  if (aLow > aHigh)
    return false;
  theFirst = aLow - CTLRX_SINC_BEFORE;
  theLast = aHigh + CTLRX_SINC_TAPS - CTLRX_SINC_BEFORE - 1;
  return true;
}

void CResampleKernel::checkReach(int32_t theMasterLine, int64_t theFirst, int64_t theLast, int32_t theMaxHeld) {
  if (theLast - theFirst + 1 > theMaxHeld)
    TLRX_RAISE_F(CTLRX_ERR_ARGUMENTS,
                 "the azimuth shifts of master line %d reach over %lld slave lines, more than the %d lines a block holds",
                 theMasterLine, static_cast<long long>(theLast - theFirst + 1), theMaxHeld);
}

void CResampleKernel::azimuthPass(const double *theColumns, const double *theLines, const TSlaveLine &theSlaveLine,
                                  std::complex<float> *theOut, SResampleScratch &theScratch) const {
  const int32_t n = mMasterPixels;
  prepare(theScratch);
  // Which master pixels see the slave, and the slave lines they need.
  const double aLastLine = double(mSlaveLines) - 1.0, aLastPixel = double(mSlavePixels) - 1.0;
  int64_t aLow = std::numeric_limits<int64_t>::max(), aHigh = std::numeric_limits<int64_t>::min();
  for (int32_t c = 0; c < n; ++c) {
    const double p = theLines[c], x = theColumns[c];
    int64_t &aFirst = theScratch.mFirstTap[static_cast<size_t>(c)];
    if (!(p >= 0.0 && p <= aLastLine && x >= 0.0 && x <= aLastPixel)) {
      aFirst = -1;
      continue;
    }
    fdfSplitPosition(p, aFirst, theScratch.mFractions[static_cast<size_t>(c)]);
    aLow = std::min(aLow, aFirst);
    aHigh = std::max(aHigh, aFirst);
  }
  if (aLow > aHigh) {
    std::fill(theOut, theOut + n, std::complex<float>(0.0f, 0.0f));
    return;
  }
  const int64_t aWindowFirst = aLow - CTLRX_SINC_BEFORE;
  const int64_t aWindowLast = aHigh + CTLRX_SINC_TAPS - CTLRX_SINC_BEFORE - 1;
  // Lines outside the slave are a line of zeros: taps there count as 0.
  std::vector<const std::complex<float> *> &aTaps = theScratch.mTaps;
  aTaps.resize(static_cast<size_t>(aWindowLast - aWindowFirst + 1));
  for (int64_t j = aWindowFirst; j <= aWindowLast; ++j)
    aTaps[static_cast<size_t>(j - aWindowFirst)] =
        j >= 0 && j < mSlaveLines ? theSlaveLine(static_cast<int32_t>(j)) : mZeros.data();
  double *aCycles = theScratch.mCycles.data();
  for (int32_t c = 0; c < n; ++c) {
    const size_t i = static_cast<size_t>(c);
    const int64_t aFirst = theScratch.mFirstTap[i];
    if (aFirst < 0) {
      theOut[c] = std::complex<float>(0.0f, 0.0f);
      aCycles[i] = 0.0;
      continue;
    }
    const double aFraction = theScratch.mFractions[i];
    const float *aW = mTable.weights(aFraction);
    const std::complex<float> *const *aRows = aTaps.data() + (aFirst - CTLRX_SINC_BEFORE - aWindowFirst);
    float aRe = 0.0f, aIm = 0.0f;
    for (int32_t k = 0; k < CTLRX_SINC_TAPS; ++k) {
      aRe += aW[k] * aRows[k][i].real();
      aIm += aW[k] * aRows[k][i].imag();
    }
    theOut[c] = std::complex<float>(aRe, aIm);
    aCycles[i] = mDoppler ? mCentroid[i] * (double(aFirst) + aFraction) : 0.0;
  }
  if (mDoppler)
    multiplyByTurns(theOut, aCycles, n);
}

// ------------------------------------------------------------ resampler

CSlaveResampler::CSlaveResampler(int32_t theSlaveLines, int32_t theSlavePixels, int32_t theMasterPixels,
                                 CShiftField &theField, std::vector<double> theCentroid, TLineReader theReader,
                                 double theOversampling)
    : mKernel(theSlaveLines, theSlavePixels, theMasterPixels, std::move(theCentroid), theOversampling),
      mField(theField), mReader(std::move(theReader)) {
  const size_t aMaster = static_cast<size_t>(mKernel.masterPixels());
  mRaw.resize(static_cast<size_t>(mKernel.slavePixels()));
  mColumns.resize(aMaster);
  mLines.resize(aMaster);
  mRangeColumns.resize(aMaster);
}

void CSlaveResampler::rangePass(int32_t theLine, std::vector<std::complex<float>> &theOut) {
  theOut.resize(static_cast<size_t>(mKernel.masterPixels()));
  mReader(theLine, mRaw.data());
  ++mLinesRead;
  mField.slaveLineColumns(theLine, mKernel.masterPixels(), mRangeColumns.data());
  mKernel.rangePass(theLine, mRaw.data(), mRangeColumns.data(), theOut.data(), mScratch);
}

void CSlaveResampler::hold(int32_t theFirst, int32_t theLast) {
  auto aTake = [this]() {
    std::vector<std::complex<float>> aLine;
    if (!mSpare.empty()) {
      aLine = std::move(mSpare.back());
      mSpare.pop_back();
    }
    return aLine;
  };
  // Lines before the window are done with.
  while (!mHeld.empty() && mFirstHeld < theFirst) {
    mSpare.push_back(std::move(mHeld.front()));
    mHeld.pop_front();
    ++mFirstHeld;
  }
  if (mHeld.empty())
    mFirstHeld = theFirst;
  // A window moving back (a field folding over in azimuth) reads lines again.
  while (mFirstHeld > theFirst) {
    std::vector<std::complex<float>> aLine = aTake();
    rangePass(mFirstHeld - 1, aLine);
    mHeld.push_front(std::move(aLine));
    --mFirstHeld;
  }
  while (mFirstHeld + static_cast<int64_t>(mHeld.size()) <= theLast) {
    std::vector<std::complex<float>> aLine = aTake();
    rangePass(mFirstHeld + static_cast<int32_t>(mHeld.size()), aLine);
    mHeld.push_back(std::move(aLine));
  }
}

void CSlaveResampler::resampleLine(int32_t theLine, std::complex<float> *theOut) {
  const int32_t n = mKernel.masterPixels();
  mField.masterLine(theLine, n, mColumns.data(), mLines.data());
  int64_t aFirst = 0, aLast = 0;
  if (!mKernel.window(mColumns.data(), mLines.data(), aFirst, aLast)) {
    std::fill(theOut, theOut + n, std::complex<float>(0.0f, 0.0f));
    return;
  }
  CResampleKernel::checkReach(theLine, aFirst, aLast, mMaxHeld);
  hold(static_cast<int32_t>(std::max<int64_t>(0, aFirst)),
       static_cast<int32_t>(std::min<int64_t>(mKernel.slaveLines() - 1, aLast)));
  mKernel.azimuthPass(
      mColumns.data(), mLines.data(),
      [this](int32_t theSlaveLine) { return mHeld[static_cast<size_t>(theSlaveLine - mFirstHeld)].data(); }, theOut,
      mScratch);
}

// ------------------------------------------------------------ Doppler

bool fdfDopplerFromHeader(const CDescription &theHeader, int32_t thePixels, std::vector<double> &theCentroid) {
  const char *const aKeys[] = {"ChannelInfo.DopplerCentroidCoeff", "ChannelInfo.PulseRepetitionFrequency",
                               "ChannelInfo.RangeSamplingRate", "ChannelInfo.RangeTimeFirstPixel"};
  const CDescriptionField *aFields[4];
  for (int i = 0; i < 4; ++i) {
    aFields[i] = theHeader.findField(aKeys[i]);
    if (aFields[i] == nullptr || !aFields[i]->holdsValue())
      return false;
  }
  const double aPrf = aFields[1]->getDouble(), aRate = aFields[2]->getDouble(), aStart = aFields[3]->getDouble();
  if (!(aPrf > 0.0) || !(aRate > 0.0) || !std::isfinite(aPrf) || !std::isfinite(aRate) || !std::isfinite(aStart))
    return false;
  std::vector<double> aCoeffs;
  for (int32_t i = 0; i < aFields[0]->getColNbr(); ++i)
    aCoeffs.push_back(aFields[0]->isSet(i) ? aFields[0]->getDouble(i) : 0.0);
  std::vector<double> aCentroid(static_cast<size_t>(std::max(0, thePixels)));
  for (size_t c = 0; c < aCentroid.size(); ++c) {
    const double t = aStart + double(c) / aRate;
    double f = 0.0;
    for (size_t i = aCoeffs.size(); i-- > 0;)
      f = f * t + aCoeffs[i];
    aCentroid[c] = std::isfinite(f) ? wrapCycles(f / aPrf) : 0.0;
  }
  theCentroid = std::move(aCentroid);
  return true;
}

std::vector<double> fdfEstimateDoppler(const CSlaveResampler::TLineReader &theReader, int32_t theLines,
                                       int32_t thePixels) {
  std::vector<double> aCentroid(static_cast<size_t>(std::max(0, thePixels)), 0.0);
  if (theLines < 2 || thePixels < 1)
    return aCentroid;
  const int32_t aBands = (thePixels + CTLRX_DOPPLER_BAND - 1) / CTLRX_DOPPLER_BAND;
  std::vector<std::complex<double>> aSums(static_cast<size_t>(aBands));
  std::vector<int64_t> aCounts(static_cast<size_t>(aBands), 0);
  std::vector<std::complex<float>> aFirst(aCentroid.size()), aSecond(aCentroid.size());
  const int32_t aPairs = std::min(CTLRX_DOPPLER_PAIRS, theLines - 1);
  for (int32_t i = 0; i < aPairs; ++i) {
    // First and last pairs at the image ends, the others evenly between.
    const int32_t aLine = aPairs > 1 ? static_cast<int32_t>(int64_t(i) * (theLines - 2) / (aPairs - 1)) : 0;
    theReader(aLine, aFirst.data());
    theReader(aLine + 1, aSecond.data());
    for (int32_t c = 0; c < thePixels; ++c) {
      const std::complex<float> a = aFirst[size_t(c)], b = aSecond[size_t(c)];
      if ((a.real() == 0.0f && a.imag() == 0.0f) || (b.real() == 0.0f && b.imag() == 0.0f))
        continue;
      aSums[size_t(c / CTLRX_DOPPLER_BAND)] += std::complex<double>(b) * std::conj(std::complex<double>(a));
      ++aCounts[size_t(c / CTLRX_DOPPLER_BAND)];
    }
  }
  // Band angles in cycles, unwrapped outwards from the valid band nearest the
  // image centre so that neighbours differ by at most half a cycle.
  std::vector<double> aAngles(static_cast<size_t>(aBands), 0.0);
  int32_t aCentre = -1;
  for (int32_t b = 0; b < aBands; ++b)
    if (aCounts[size_t(b)] > 0 && std::abs(aSums[size_t(b)]) > 0.0) {
      aAngles[size_t(b)] = std::arg(aSums[size_t(b)]) / CTLRX_RS_TWO_PI;
      if (aCentre < 0 || std::abs(2 * b - (aBands - 1)) < std::abs(2 * aCentre - (aBands - 1)))
        aCentre = b;
    } else {
      aCounts[size_t(b)] = 0;
    }
  if (aCentre < 0)
    return aCentroid;
  for (const int32_t aStep : {1, -1}) {
    int32_t aPrevious = aCentre;
    for (int32_t b = aCentre + aStep; b >= 0 && b < aBands; b += aStep) {
      if (aCounts[size_t(b)] == 0)
        continue;
      aAngles[size_t(b)] += std::nearbyint(aAngles[size_t(aPrevious)] - aAngles[size_t(b)]);
      aPrevious = b;
    }
  }
  // Straight line in the column, each band at the centre of its columns and
  // weighted by its cell count.
  double aW = 0, aX = 0, aY = 0, aXX = 0, aXY = 0;
  for (int32_t b = 0; b < aBands; ++b) {
    const double w = double(aCounts[size_t(b)]);
    const int32_t aEnd = std::min(thePixels, (b + 1) * CTLRX_DOPPLER_BAND);
    const double x = 0.5 * (b * CTLRX_DOPPLER_BAND + aEnd - 1), y = aAngles[size_t(b)];
    aW += w;
    aX += w * x;
    aY += w * y;
    aXX += w * x * x;
    aXY += w * x * y;
  }
  const double aMeanX = aX / aW, aMeanY = aY / aW;
  const double aSpread = aXX / aW - aMeanX * aMeanX;
  const double aSlope = aSpread > 1e-9 ? (aXY / aW - aMeanX * aMeanY) / aSpread : 0.0;
  for (size_t c = 0; c < aCentroid.size(); ++c)
    aCentroid[c] = wrapCycles(aMeanY + aSlope * (double(c) - aMeanX));
  return aCentroid;
}
