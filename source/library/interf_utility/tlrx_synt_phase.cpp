// Synthetic phase (see tlrx_synt_phase.h): the block estimator, the fit, the
// height looks and the step program with its two passes.
#include "tlrx_synt_phase.h"

#include <algorithm>
#include <cctype>
#include <cmath>
#include <cstdarg>
#include <cstdio>
#include <stdexcept>
#include <string>

#include "tlrx_description_section.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"
#include "tlrx_raster_file.h"
#include "tlrx_result_files.h"
#include "tlrx_step_common.h"

namespace {

using TCell = std::complex<float>;

constexpr double CTLRX_SYNT_TWO_PI = 6.283185307179586476925;
constexpr int CTLRX_SYNT_REFINEMENTS = 2;
constexpr int32_t CTLRX_SYNT_ARGUMENTS = 24;       // argc of the chain's call
constexpr int32_t CTLRX_SYNT_CLOSE_ARGUMENTS = 23; // argc the closing needs
constexpr double CTLRX_SYNT_RANK_TOLERANCE = 1e-9;
constexpr int32_t CTLRX_SYNT_SAMPLES = 16; // per axis, for a block's curvature

// Exponents (p, q) of u^p v^q, by degree.
constexpr int CTLRX_SYNT_POWERS[CTLRX_SYNT_TERMS][2] = {{1, 0}, {0, 1}, {2, 0}, {1, 1}, {0, 2},
                                                         {3, 0}, {2, 1}, {1, 2}, {0, 3}};

int32_t termsOfDegree(int32_t theDegree) { return (theDegree + 1) * (theDegree + 2) / 2 - 1; }

bool isValid(const TCell &theCell) {
  return theCell != TCell() && std::isfinite(theCell.real()) && std::isfinite(theCell.imag());
}

// sum of theCells[j] thePhasors[j] over [theFrom, theTo), written out so the
// compiler need not guard a complex product against infinities.
std::complex<double> demodulatedSum(const TCell *theCells, const std::complex<double> *thePhasors, int32_t theFrom,
                                   int32_t theTo) {
  double aRe = 0.0, aIm = 0.0;
  for (int32_t j = theFrom; j < theTo; ++j) {
    const double a = theCells[j].real(), b = theCells[j].imag();
    const double c = thePhasors[j].real(), d = thePhasors[j].imag();
    aRe += a * c - b * d;
    aIm += a * d + b * c;
  }
  return {aRe, aIm};
}

int32_t signedBin(int32_t theBin, int32_t theSize) { return theBin < (theSize + 1) / 2 ? theBin : theBin - theSize; }

// Weighted least squares min |A x - b| by Householder QR with column
// pivoting on unit-norm columns; theRows x theCols, row-major. Columns that
// fall below the rank tolerance are set to 0 (the blocks cannot tell them).
std::vector<double> leastSquares(std::vector<double> theA, std::vector<double> theB, int32_t theRows,
                                 int32_t theCols) {
  std::vector<double> aScale(static_cast<size_t>(theCols), 0.0), aX(static_cast<size_t>(theCols), 0.0);
  const auto at = [&](int32_t r, int32_t c) -> double & {
    return theA[static_cast<size_t>(r) * static_cast<size_t>(theCols) + static_cast<size_t>(c)];
  };
  for (int32_t c = 0; c < theCols; ++c) {
    double aNorm = 0.0;
    for (int32_t r = 0; r < theRows; ++r)
      aNorm += at(r, c) * at(r, c);
    aScale[static_cast<size_t>(c)] = aNorm > 0.0 ? 1.0 / std::sqrt(aNorm) : 0.0;
    for (int32_t r = 0; r < theRows; ++r)
      at(r, c) *= aScale[static_cast<size_t>(c)];
  }
  std::vector<int32_t> aOrder(static_cast<size_t>(theCols));
  for (int32_t c = 0; c < theCols; ++c)
    aOrder[static_cast<size_t>(c)] = c;
  int32_t aRank = 0;
  double aFirst = 0.0;
  for (int32_t k = 0; k < std::min(theRows, theCols); ++k) {
    int32_t aBest = k;
    double aBestNorm = -1.0;
    for (int32_t c = k; c < theCols; ++c) {
      double aNorm = 0.0;
      for (int32_t r = k; r < theRows; ++r)
        aNorm += at(r, c) * at(r, c);
      if (aNorm > aBestNorm) {
        aBestNorm = aNorm;
        aBest = c;
      }
    }
    const double aAlpha = std::sqrt(aBestNorm);
    if (k == 0)
      aFirst = aAlpha;
    if (!(aAlpha > CTLRX_SYNT_RANK_TOLERANCE * aFirst) || aAlpha == 0.0)
      break;
    if (aBest != k) {
      for (int32_t r = 0; r < theRows; ++r)
        std::swap(at(r, k), at(r, aBest));
      std::swap(aOrder[static_cast<size_t>(k)], aOrder[static_cast<size_t>(aBest)]);
    }
    // Householder reflection of column k below the diagonal onto -sign alpha e_k.
    const double aDiagonal = at(k, k) >= 0.0 ? -aAlpha : aAlpha;
    std::vector<double> aV(static_cast<size_t>(theRows - k));
    for (int32_t r = k; r < theRows; ++r)
      aV[static_cast<size_t>(r - k)] = at(r, k);
    aV[0] -= aDiagonal;
    double aVNorm = 0.0;
    for (double aValue : aV)
      aVNorm += aValue * aValue;
    if (aVNorm > 0.0) {
      for (int32_t c = k; c < theCols; ++c) {
        double aDot = 0.0;
        for (int32_t r = k; r < theRows; ++r)
          aDot += aV[static_cast<size_t>(r - k)] * at(r, c);
        for (int32_t r = k; r < theRows; ++r)
          at(r, c) -= 2.0 * aDot / aVNorm * aV[static_cast<size_t>(r - k)];
      }
      double aDot = 0.0;
      for (int32_t r = k; r < theRows; ++r)
        aDot += aV[static_cast<size_t>(r - k)] * theB[static_cast<size_t>(r)];
      for (int32_t r = k; r < theRows; ++r)
        theB[static_cast<size_t>(r)] -= 2.0 * aDot / aVNorm * aV[static_cast<size_t>(r - k)];
    }
    aRank = k + 1;
  }
  std::vector<double> aY(static_cast<size_t>(theCols), 0.0);
  for (int32_t k = aRank - 1; k >= 0; --k) {
    double aSum = theB[static_cast<size_t>(k)];
    for (int32_t c = k + 1; c < aRank; ++c)
      aSum -= at(k, c) * aY[static_cast<size_t>(c)];
    aY[static_cast<size_t>(k)] = aSum / at(k, k);
  }
  for (int32_t k = 0; k < theCols; ++k) {
    const size_t aColumn = static_cast<size_t>(aOrder[static_cast<size_t>(k)]);
    aX[aColumn] = aY[static_cast<size_t>(k)] * aScale[aColumn];
  }
  return aX;
}

} // namespace

// ------------------------------------------------------------ the model

double SSyntPhaseModel::polynomial(double theX, double theY) const {
  const double u = (theX - mCentreX) / mScaleX, v = (theY - mCentreY) / mScaleY;
  // The monomials in the order of CTLRX_SYNT_POWERS.
  const double aMonomials[CTLRX_SYNT_TERMS] = {u, v, u * u, u * v, v * v, u * u * u, u * u * v, u * v * v, v * v * v};
  double aSum = 0.0;
  for (int32_t t = 0; t < termsOfDegree(mDegree); ++t)
    aSum += mCoefficients[static_cast<size_t>(t)] * aMonomials[t];
  return aSum;
}

double SSyntPhaseModel::phase(double theX, double theY, double theHeight, bool theKnown) const {
  if (mDegree == 0)
    return 0.0;
  return CTLRX_SYNT_TWO_PI * polynomial(theX, theY) + (mHasHeight && theKnown ? mK * theHeight : 0.0) + mC;
}

void SSyntPhaseModel::line(int32_t theLine, int32_t thePixels, const double *theHeights, const uint8_t *theKnown,
                           float *theOut) const {
  if (mDegree == 0) {
    std::fill(theOut, theOut + thePixels, 0.0f);
    return;
  }
  // P along the line as a cubic in u, its coefficients fixed by v (unused
  // terms of a lower degree are 0).
  const double v = (theLine - mCentreY) / mScaleY;
  const std::array<double, CTLRX_SYNT_TERMS> &a = mCoefficients;
  const double aC0 = ((a[8] * v + a[4]) * v + a[1]) * v, aC1 = (a[7] * v + a[3]) * v + a[0], aC2 = a[6] * v + a[2],
               aC3 = a[5];
  const bool aHeights = mHasHeight && theHeights != nullptr && theKnown != nullptr;
  for (int32_t x = 0; x < thePixels; ++x) {
    const double u = (x - mCentreX) / mScaleX;
    double aPhase = CTLRX_SYNT_TWO_PI * (((aC3 * u + aC2) * u + aC1) * u + aC0) + mC;
    if (aHeights && theKnown[x] != 0)
      aPhase += mK * theHeights[x];
    theOut[x] = static_cast<float>(aPhase);
  }
}

// ------------------------------------------------------------ pass 1

double fdfSyntSnrThreshold(int32_t theBins) {
  if (theBins <= 4)
    return HUGE_VAL;
  // P(Beta(4, n - 4) > x) = P(Binomial(n - 1, x) < 4), increasing T lowers it.
  const double n = theBins;
  const auto aFalseAlarm = [n](double theSnr) {
    const double x = theSnr / (n + theSnr);
    double aSum = 0.0, aChoose = 1.0;
    for (int j = 0; j < 4; ++j) {
      aSum += std::exp(std::log(aChoose) + j * std::log(x) + (n - 1 - j) * std::log1p(-x));
      aChoose *= (n - 1 - j) / (j + 1);
    }
    return n * aSum;
  };
  double aLow = 0.0, aHigh = 1e6;
  for (int i = 0; i < 100; ++i) {
    const double aMid = 0.5 * (aLow + aHigh);
    (aFalseAlarm(aMid) > CTLRX_SYNT_FALSE_ALARM ? aLow : aHigh) = aMid;
  }
  return aHigh;
}

CSyntBlockEstimator::CSyntBlockEstimator(int32_t theLines, int32_t thePixels, bool theHeights)
    : mLines(theLines), mPixels(thePixels), mBlockLines(std::min(CTLRX_SYNT_BLOCK, theLines)),
      mBlockPixels(std::min(CTLRX_SYNT_BLOCK, thePixels)), mHeights(theHeights),
      mActive(mBlockLines >= CTLRX_SYNT_MIN_BLOCK && mBlockPixels >= CTLRX_SYNT_MIN_BLOCK),
      mThreshold(fdfSyntSnrThreshold(mBlockLines * mBlockPixels)) {
  if (theLines < 1 || thePixels < 1)
    throw std::invalid_argument("CSyntBlockEstimator: lines and pixels must be at least 1");
  if (!mActive)
    return;
  const size_t aCells = static_cast<size_t>(mBlockLines) * static_cast<size_t>(mPixels);
  mCells.assign(aCells, TCell());
  if (mHeights) {
    mHeightCells.assign(aCells, 0.0);
    mKnown.assign(aCells, 0);
  }
  mPlan = &fdfFftPlan(mBlockLines, mBlockPixels, ETLRXFftDirection::FORWARD);
  if (!mPlan->isValid())
    throw std::runtime_error("CSyntBlockEstimator: no FFT plan for the blocks");
  mSpectrum.resize(static_cast<size_t>(mBlockLines) * static_cast<size_t>(mBlockPixels));
  mPower.resize(mSpectrum.size());
  mRangePhasors.resize(static_cast<size_t>(mBlockPixels));
  mAzimuthPhasors.resize(static_cast<size_t>(mBlockLines));
}

void CSyntBlockEstimator::pushLine(const TCell *theCells, const double *theHeights, const uint8_t *theKnown) {
  if (mPushed >= mLines)
    throw std::logic_error("CSyntBlockEstimator: more lines than the image holds");
  ++mPushed;
  if (!mActive)
    return;
  const size_t aOffset = static_cast<size_t>(mPushed - 1 - mRowStart) * static_cast<size_t>(mPixels);
  // No data is held as 0 + 0i, so the sums below need no test.
  std::transform(theCells, theCells + mPixels, mCells.begin() + static_cast<std::ptrdiff_t>(aOffset),
                 [](const TCell &theCell) { return isValid(theCell) ? theCell : TCell(); });
  if (mHeights) {
    std::copy(theHeights, theHeights + mPixels, mHeightCells.begin() + static_cast<std::ptrdiff_t>(aOffset));
    std::copy(theKnown, theKnown + mPixels, mKnown.begin() + static_cast<std::ptrdiff_t>(aOffset));
  }
  if (mPushed - mRowStart == mBlockLines) {
    measureRow(mBlockLines);
    mRowStart = mPushed;
  }
}

void CSyntBlockEstimator::finish() {
  const int32_t aRows = mPushed - mRowStart;
  // A last partial block row counts when it holds at least half a block.
  if (mActive && aRows > 0 && 2 * aRows >= mBlockLines)
    measureRow(aRows);
  mRowStart = mPushed;
}

void CSyntBlockEstimator::measureRow(int32_t theRows) {
  for (int32_t aCol = 0; aCol < mPixels; aCol += mBlockPixels) {
    const int32_t aWidth = std::min(mBlockPixels, mPixels - aCol);
    if (2 * aWidth >= mBlockPixels)
      measureBlock(aCol, aWidth, theRows);
  }
}

// The block of columns theCol.. theCol + theWidth - 1 and rows 0..theRows - 1
// of the block row; a partial block is zero-padded to the transform size.
void CSyntBlockEstimator::measureBlock(int32_t theCol, int32_t theWidth, int32_t theRows) {
  ++mExamined;
  const size_t aBins = mSpectrum.size();
  TCell *aSpectrum = mSpectrum.data();
  std::fill(aSpectrum, aSpectrum + aBins, TCell());
  int64_t aValid = 0;
  for (int32_t i = 0; i < theRows; ++i) {
    const TCell *aIn = &mCells[static_cast<size_t>(i) * static_cast<size_t>(mPixels) + static_cast<size_t>(theCol)];
    TCell *aOut = aSpectrum + static_cast<size_t>(i) * static_cast<size_t>(mBlockPixels);
    for (int32_t j = 0; j < theWidth; ++j) {
      aOut[j] = aIn[j];
      aValid += aIn[j] != TCell() ? 1 : 0;
    }
  }
  if (2 * aValid < static_cast<int64_t>(theRows) * theWidth)
    return;
  mPlan->execute(aSpectrum);
  double aTotal = 0.0;
  size_t aPeak = 0;
  for (size_t k = 0; k < aBins; ++k) {
    mPower[k] = std::norm(aSpectrum[k]);
    aTotal += mPower[k];
    if (mPower[k] > mPower[aPeak])
      aPeak = k;
  }
  const int32_t aKr = static_cast<int32_t>(aPeak) / mBlockPixels, aKc = static_cast<int32_t>(aPeak) % mBlockPixels;
  const auto aPower = [&](int32_t theR, int32_t theC) {
    const int32_t r = (theR + mBlockLines) % mBlockLines, c = (theC + mBlockPixels) % mBlockPixels;
    return static_cast<double>(mPower[static_cast<size_t>(r) * static_cast<size_t>(mBlockPixels) + static_cast<size_t>(c)]);
  };
  const int32_t aDr = aPower(aKr + 1, aKc) >= aPower(aKr - 1, aKc) ? 1 : -1;
  const int32_t aDc = aPower(aKr, aKc + 1) >= aPower(aKr, aKc - 1) ? 1 : -1;
  double aPeakPower = aPower(aKr, aKc);
  if (mBlockLines > 1)
    aPeakPower += aPower(aKr + aDr, aKc);
  if (mBlockPixels > 1)
    aPeakPower += aPower(aKr, aKc + aDc);
  if (mBlockLines > 1 && mBlockPixels > 1)
    aPeakPower += aPower(aKr + aDr, aKc + aDc);
  const double aRest = aTotal - aPeakPower;
  const double aSnr = aRest > 0.0 ? static_cast<double>(aBins) * aPeakPower / aRest : HUGE_VAL;
  if (!(aSnr > mThreshold))
    return;

  // Below the bin: the phase of one half's demodulated sum against the
  // other's, over the distance of their valid cells' centroids.
  double aFr = static_cast<double>(signedBin(aKc, mBlockPixels)) / mBlockPixels;
  double aFa = static_cast<double>(signedBin(aKr, mBlockLines)) / mBlockLines;
  const double aXc = 0.5 * (theWidth - 1), aYc = 0.5 * (theRows - 1);
  const int32_t aMidX = theWidth / 2, aMidY = theRows / 2;
  double aX[2] = {0, 0}, aY[2] = {0, 0}, aNx[2] = {0, 0}, aNy[2] = {0, 0};
  for (int32_t i = 0; i < theRows; ++i) {
    const TCell *aIn = &mCells[static_cast<size_t>(i) * static_cast<size_t>(mPixels) + static_cast<size_t>(theCol)];
    for (int32_t j = 0; j < theWidth; ++j)
      if (aIn[j] != TCell()) {
        const int aHx = j < aMidX ? 0 : 1, aHy = i < aMidY ? 0 : 1;
        aX[aHx] += j;
        aNx[aHx] += 1;
        aY[aHy] += i;
        aNy[aHy] += 1;
      }
  }
  if (aNx[0] == 0 || aNx[1] == 0 || aNy[0] == 0 || aNy[1] == 0)
    return;
  const double aLagX = aX[1] / aNx[1] - aX[0] / aNx[0], aLagY = aY[1] / aNy[1] - aY[0] / aNy[0];
  std::complex<double> aSum;
  for (int aPass = 0; aPass <= CTLRX_SYNT_REFINEMENTS; ++aPass) {
    for (int32_t j = 0; j < theWidth; ++j)
      mRangePhasors[static_cast<size_t>(j)] = std::polar(1.0, -CTLRX_SYNT_TWO_PI * aFr * (j - aXc));
    for (int32_t i = 0; i < theRows; ++i)
      mAzimuthPhasors[static_cast<size_t>(i)] = std::polar(1.0, -CTLRX_SYNT_TWO_PI * aFa * (i - aYc));
    std::complex<double> aHalfX[2], aHalfY[2];
    aSum = 0.0;
    for (int32_t i = 0; i < theRows; ++i) {
      const TCell *aIn = &mCells[static_cast<size_t>(i) * static_cast<size_t>(mPixels) + static_cast<size_t>(theCol)];
      const std::complex<double> aLeft = demodulatedSum(aIn, mRangePhasors.data(), 0, aMidX);
      const std::complex<double> aRight = demodulatedSum(aIn, mRangePhasors.data(), aMidX, theWidth);
      const std::complex<double> aRow = (aLeft + aRight) * mAzimuthPhasors[static_cast<size_t>(i)];
      aHalfX[0] += aLeft * mAzimuthPhasors[static_cast<size_t>(i)];
      aHalfX[1] += aRight * mAzimuthPhasors[static_cast<size_t>(i)];
      aHalfY[i < aMidY ? 0 : 1] += aRow;
      aSum += aRow;
    }
    if (aPass == CTLRX_SYNT_REFINEMENTS)
      break;
    aFr += std::arg(aHalfX[1] * std::conj(aHalfX[0])) / (CTLRX_SYNT_TWO_PI * aLagX);
    aFa += std::arg(aHalfY[1] * std::conj(aHalfY[0])) / (CTLRX_SYNT_TWO_PI * aLagY);
  }

  SSyntBlock aBlock;
  aBlock.mX = theCol + aXc;
  aBlock.mY = mRowStart + aYc;
  aBlock.mCols = theWidth;
  aBlock.mRows = theRows;
  aBlock.mFr = aFr;
  aBlock.mFa = aFa;
  aBlock.mSum = aSum;
  aBlock.mSnr = aSnr;
  // The half-lag frequency's variance goes as n / (|S|^2 lag^2).
  const double aCoherent = std::norm(aSum) / static_cast<double>(aValid);
  aBlock.mWeightRange = aCoherent * aLagX * aLagX;
  aBlock.mWeightAzimuth = aCoherent * aLagY * aLagY;
  if (mHeights)
    heightPlane(theCol, theWidth, theRows, aBlock);
  mKept.push_back(aBlock);
}

// Least-squares plane h0 + gx dx + gy dy of the block's known heights about
// its centre; none when fewer than half are known or they fix no plane.
void CSyntBlockEstimator::heightPlane(int32_t theCol, int32_t theWidth, int32_t theRows, SSyntBlock &theBlock) const {
  const double aXc = 0.5 * (theWidth - 1), aYc = 0.5 * (theRows - 1);
  // Sums of 1, x, y, xx, xy, yy, h, xh, yh over the known cells.
  double aS[9] = {0, 0, 0, 0, 0, 0, 0, 0, 0};
  for (int32_t i = 0; i < theRows; ++i) {
    const size_t aRow = static_cast<size_t>(i) * static_cast<size_t>(mPixels) + static_cast<size_t>(theCol);
    for (int32_t j = 0; j < theWidth; ++j) {
      if (mKnown[aRow + static_cast<size_t>(j)] == 0)
        continue;
      const double x = j - aXc, y = i - aYc, h = mHeightCells[aRow + static_cast<size_t>(j)];
      const double aTerms[9] = {1, x, y, x * x, x * y, y * y, h, x * h, y * h};
      for (int k = 0; k < 9; ++k)
        aS[k] += aTerms[k];
    }
  }
  if (2 * aS[0] < static_cast<double>(theRows) * theWidth)
    return;
  // Cramer's rule on the 3 x 3 normal equations.
  const auto aDet3 = [](double a, double b, double c, double d, double e, double f, double g, double h, double i) {
    return a * (e * i - f * h) - b * (d * i - f * g) + c * (d * h - e * g);
  };
  const double aDet = aDet3(aS[0], aS[1], aS[2], aS[1], aS[3], aS[4], aS[2], aS[4], aS[5]);
  if (!(std::fabs(aDet) > 1e-9 * aS[0] * aS[3] * aS[5]))
    return;
  theBlock.mHasHeight = true;
  theBlock.mHeight = aDet3(aS[6], aS[1], aS[2], aS[7], aS[3], aS[4], aS[8], aS[4], aS[5]) / aDet;
  theBlock.mDhDx = aDet3(aS[0], aS[6], aS[2], aS[1], aS[7], aS[4], aS[2], aS[8], aS[5]) / aDet;
  theBlock.mDhDy = aDet3(aS[0], aS[1], aS[6], aS[1], aS[3], aS[7], aS[2], aS[4], aS[8]) / aDet;
}

// ------------------------------------------------------------ the fit

namespace {

// The mean over theBlock of e^(2 pi i (P - its value and the block's
// frequencies at the centre)), sampled on a grid of up to 16 x 16 points:
// what the block's sum would hold besides the phase at its centre.
std::complex<double> curvature(const SSyntPhaseModel &theModel, const SSyntBlock &theBlock) {
  const int32_t aNx = std::min(CTLRX_SYNT_SAMPLES, theBlock.mCols), aNy = std::min(CTLRX_SYNT_SAMPLES, theBlock.mRows);
  const double aCentre = theModel.polynomial(theBlock.mX, theBlock.mY);
  std::complex<double> aSum;
  for (int32_t i = 0; i < aNy; ++i)
    for (int32_t j = 0; j < aNx; ++j) {
      const double dx = (j + 0.5) * theBlock.mCols / aNx - 0.5 * theBlock.mCols;
      const double dy = (i + 0.5) * theBlock.mRows / aNy - 0.5 * theBlock.mRows;
      const double aCycles = theModel.polynomial(theBlock.mX + dx, theBlock.mY + dy) - aCentre - theBlock.mFr * dx -
                             theBlock.mFa * dy;
      aSum += std::polar(1.0, CTLRX_SYNT_TWO_PI * aCycles);
    }
  return aSum / static_cast<double>(aNx * aNy);
}

} // namespace

SSyntPhaseModel fdfFitSyntPhase(const std::vector<SSyntBlock> &theBlocks, int64_t theExamined, int32_t theLines,
                                int32_t thePixels, bool theWithHeight) {
  SSyntPhaseModel aModel;
  aModel.mBlocks = theExamined;
  aModel.mCentreX = 0.5 * (thePixels - 1);
  aModel.mScaleX = std::max(1.0, aModel.mCentreX);
  aModel.mCentreY = 0.5 * (theLines - 1);
  aModel.mScaleY = std::max(1.0, aModel.mCentreY);
  std::vector<const SSyntBlock *> aUsed;
  for (const SSyntBlock &aBlock : theBlocks)
    if ((!theWithHeight || aBlock.mHasHeight) && aBlock.mWeightRange > 0.0 && aBlock.mWeightAzimuth > 0.0)
      aUsed.push_back(&aBlock);
  const int32_t n = static_cast<int32_t>(std::min<size_t>(aUsed.size(), INT32_MAX / 4));
  // Heights known in too few blocks to fit k: the fringes still count.
  if (theWithHeight && n < termsOfDegree(1) + 1)
    return fdfFitSyntPhase(theBlocks, theExamined, theLines, thePixels, false);
  aModel.mKept = n;
  if (n == 0)
    return aModel;
  aModel.mHasHeight = theWithHeight;
  const int32_t aK = aModel.mHasHeight ? 1 : 0;
  aModel.mDegree = 1;
  for (int32_t d = CTLRX_SYNT_MAX_DEGREE; d > 1; --d)
    if (n >= termsOfDegree(d) + aK) {
      aModel.mDegree = d;
      break;
    }
  const int32_t aTerms = termsOfDegree(aModel.mDegree), aCols = aTerms + aK, aRows = 2 * n;
  std::vector<double> aA(static_cast<size_t>(aRows) * static_cast<size_t>(aCols), 0.0), aB(static_cast<size_t>(aRows));
  for (int32_t b = 0; b < n; ++b) {
    const SSyntBlock &aBlock = *aUsed[static_cast<size_t>(b)];
    const double u = (aBlock.mX - aModel.mCentreX) / aModel.mScaleX, v = (aBlock.mY - aModel.mCentreY) / aModel.mScaleY;
    const double aWr = std::sqrt(aBlock.mWeightRange), aWa = std::sqrt(aBlock.mWeightAzimuth);
    double *aRange = &aA[static_cast<size_t>(2 * b) * static_cast<size_t>(aCols)];
    double *aAzimuth = aRange + aCols;
    for (int32_t t = 0; t < aTerms; ++t) {
      const int p = CTLRX_SYNT_POWERS[t][0], q = CTLRX_SYNT_POWERS[t][1];
      // d/dx of u^p v^q is p u^(p-1) v^q / scaleX; likewise along y.
      aRange[t] = p == 0 ? 0.0 : aWr * p * std::pow(u, p - 1) * std::pow(v, q) / aModel.mScaleX;
      aAzimuth[t] = q == 0 ? 0.0 : aWa * q * std::pow(u, p) * std::pow(v, q - 1) / aModel.mScaleY;
    }
    if (aK == 1) {
      aRange[aTerms] = aWr * aBlock.mDhDx / CTLRX_SYNT_TWO_PI;
      aAzimuth[aTerms] = aWa * aBlock.mDhDy / CTLRX_SYNT_TWO_PI;
    }
    aB[static_cast<size_t>(2 * b)] = aWr * aBlock.mFr;
    aB[static_cast<size_t>(2 * b + 1)] = aWa * aBlock.mFa;
  }
  const std::vector<double> aX = leastSquares(aA, aB, aRows, aCols);
  for (int32_t t = 0; t < aTerms; ++t)
    aModel.mCoefficients[static_cast<size_t>(t)] = aX[static_cast<size_t>(t)];
  aModel.mK = aK == 1 ? aX[static_cast<size_t>(aTerms)] : 0.0;
  std::complex<double> aSum;
  for (const SSyntBlock *aBlock : aUsed)
    aSum += aBlock->mSum * std::conj(curvature(aModel, *aBlock)) *
            std::polar(1.0, -(CTLRX_SYNT_TWO_PI * aModel.polynomial(aBlock->mX, aBlock->mY) +
                              aModel.mK * aBlock->mHeight));
  aModel.mC = aSum == std::complex<double>() ? 0.0 : std::arg(aSum);
  return aModel;
}

// ------------------------------------------------------------ heights

bool fdfHeightLooks(int32_t theLines, int32_t thePixels, int32_t theDemLines, int32_t theDemPixels,
                    int32_t theAzimuthLooks, int32_t theRangeLooks, SHeightLooks &theLooks) {
  theLooks = SHeightLooks{theAzimuthLooks, theRangeLooks, 1};
  if (theAzimuthLooks < 1 || theRangeLooks < 1 || theDemPixels < 1 ||
      static_cast<int64_t>(theLines) * theAzimuthLooks > theDemLines)
    return false;
  if (static_cast<int64_t>(thePixels) * theRangeLooks <= theDemPixels)
    return true;
  // A range-oversampled interferogram: f cells per elevation pixel.
  if (thePixels % theDemPixels == 0 && thePixels / theDemPixels >= 2) {
    theLooks.mRange = 1;
    theLooks.mOversampling = thePixels / theDemPixels;
    return true;
  }
  return false;
}

void fdfMultilookHeights(const double *theRows, int32_t theDemPixels, const SHeightLooks &theLooks,
                         const SNoData &theNull, int32_t thePixels, double *theHeights, uint8_t *theKnown) {
  const int32_t aWidth = theLooks.mOversampling >= 2 ? 1 : theLooks.mRange;
  const double aCount = static_cast<double>(aWidth) * theLooks.mAzimuth;
  for (int32_t p = 0; p < thePixels; ++p) {
    const int32_t aFirst = theLooks.mOversampling >= 2 ? p / theLooks.mOversampling : p * theLooks.mRange;
    double aSum = 0.0;
    bool aKnown = true;
    for (int32_t a = 0; a < theLooks.mAzimuth && aKnown; ++a) {
      const double *aRow = theRows + static_cast<size_t>(a) * static_cast<size_t>(theDemPixels);
      for (int32_t r = 0; r < aWidth; ++r) {
        const double h = aRow[aFirst + r];
        if (theNull.isNullOrNaN(h) || !std::isfinite(h)) {
          aKnown = false;
          break;
        }
        aSum += h;
      }
    }
    theHeights[p] = aKnown ? aSum / aCount : 0.0;
    theKnown[p] = aKnown ? 1 : 0;
  }
}

// ------------------------------------------------------------ the step

namespace {

// The same line to the log and the trace.
void note(const char *theFormat, ...) __attribute__((format(printf, 1, 2)));
void note(const char *theFormat, ...) {
  char aText[1024];
  va_list aArgs;
  va_start(aArgs, theFormat);
  std::vsnprintf(aText, sizeof aText, theFormat, aArgs);
  va_end(aArgs);
  fdfLogMessage("%s", aText);
  fdfTraceMessage("%s", aText);
}

// The arguments the chain passes that this estimate does not read; the
// numbers are still checked so a broken parameter file is noticed.
enum class ESyntArgument { TEXT, INTEGER, REAL };
struct SSyntUnused {
  int mIndex;
  const char *mName;
  ESyntArgument mKind;
};
constexpr SSyntUnused CTLRX_SYNT_UNUSED[] = {
    {2, "slave power image", ESyntArgument::TEXT},
    {3, "argument 3", ESyntArgument::TEXT},
    {5, "ground control points", ESyntArgument::TEXT},
    {6, "synt_phase_interp_box_size", ESyntArgument::INTEGER},
    {7, "synt_phase_mean_box_size", ESyntArgument::INTEGER},
    {8, "synt_phase_orbit_interp_val", ESyntArgument::INTEGER},
    {10, "synt_optimal_resolution_flag", ESyntArgument::TEXT},
    {11, "argument 11", ESyntArgument::TEXT},
    {12, "argument 12", ESyntArgument::TEXT},
    {13, "argument 13", ESyntArgument::TEXT},
    {14, "synt_resamp_grid_size", ESyntArgument::REAL},
    {15, "automatic slave orbital correction", ESyntArgument::TEXT},
    {16, "argument 16", ESyntArgument::TEXT},
    {17, "co-registration parameter file", ESyntArgument::TEXT},
    {18, "argument 18", ESyntArgument::TEXT},
    {19, "argument 19", ESyntArgument::TEXT},
    {20, "argument 20", ESyntArgument::TEXT},
    {21, "argument 21", ESyntArgument::TEXT},
    {22, "argument 22", ESyntArgument::TEXT},
    {23, "argument 23", ESyntArgument::TEXT},
};

bool namesNoFile(const std::string &theName) {
  std::string aLower;
  for (char aChar : theName)
    aLower += static_cast<char>(std::tolower(static_cast<unsigned char>(aChar)));
  return aLower.empty() || aLower == "notok";
}

// The elevation model's heights on the interferogram's grid, line by line.
class CHeightReader {
public:
  CHeightReader(CRasterFile &theDem, const SHeightLooks &theLooks, const SNoData &theNull, int32_t thePixels)
      : mDem(theDem), mLooks(theLooks), mNull(theNull), mPixels(thePixels),
        mRows(static_cast<size_t>(theLooks.mAzimuth) * static_cast<size_t>(theDem.getNrOfPixelsPerLine())),
        mHeights(static_cast<size_t>(thePixels)), mKnown(static_cast<size_t>(thePixels)) {}
  void read(int32_t theLine) {
    const int32_t aDemPixels = mDem.getNrOfPixelsPerLine();
    for (int32_t a = 0; a < mLooks.mAzimuth; ++a)
      mDem.getLine(&mRows[static_cast<size_t>(a) * static_cast<size_t>(aDemPixels)], theLine * mLooks.mAzimuth + a);
    fdfMultilookHeights(mRows.data(), aDemPixels, mLooks, mNull, mPixels, mHeights.data(), mKnown.data());
  }
  const double *heights() const { return mHeights.data(); }
  const uint8_t *known() const { return mKnown.data(); }

private:
  CRasterFile &mDem;
  SHeightLooks mLooks;
  SNoData mNull;
  int32_t mPixels;
  std::vector<double> mRows;
  std::vector<double> mHeights;
  std::vector<uint8_t> mKnown;
};

void logModel(const SSyntPhaseModel &theModel, bool theWithHeight) {
  note("\nsynthetic phase: %lld of %lld blocks kept", static_cast<long long>(theModel.mKept),
       static_cast<long long>(theModel.mBlocks));
  if (theModel.mDegree == 0) {
    note("\nno significant fringe found: synthetic phase 0");
    return;
  }
  char aTerms[512];
  int aUsed = 0;
  for (int32_t t = 0; t < termsOfDegree(theModel.mDegree) && aUsed < static_cast<int>(sizeof aTerms); ++t)
    aUsed += std::snprintf(aTerms + aUsed, sizeof aTerms - static_cast<size_t>(aUsed), " %.9g",
                           theModel.mCoefficients[static_cast<size_t>(t)]);
  note("\npolynomial degree %d, coefficients (cycles; u, v, u^2, uv, v^2, u^3, u^2 v, u v^2, v^3):%s",
       theModel.mDegree, aTerms);
  if (theModel.mHasHeight)
    note("\nheight term k: %.9g radians per height unit", theModel.mK);
  else if (theWithHeight)
    note("\nheight term not fitted: too few blocks with heights");
  note("\nconstant phase c: %.9g radians", theModel.mC);
}

} // namespace

int tlrx_split_synt_phase(int argc, char **argv) {
  fdfTraceMessage("*** synthetic phase from the interferogram's fringes ***\n");
  if (argc < CTLRX_SYNT_ARGUMENTS) {
    fdfTraceMessage("Usage: %s <master power> <slave power> NotOK <elevation model|NotOK> <gcp|NotOK> "
                    "<interp box> <mean box> <orbit interp> <output root> <optimal resolution> NotOK NotOK NotOK "
                    "<resampling grid> <OK|NotOK> NotOK <parameter file> 1 1 OK NotOK NotOK NotOK\n",
                    argc > 0 ? argv[0] : "tlrx_split_synt_phase");
    TLRX_RAISE(CTLRX_ERR_ARGUMENTS, nullptr);
  }
  for (const SSyntUnused &aArgument : CTLRX_SYNT_UNUSED) {
    if (aArgument.mKind == ESyntArgument::INTEGER)
      fdfIntegerToken(argv[aArgument.mIndex], aArgument.mName, CTLRX_ERR_ARGUMENTS);
    else if (aArgument.mKind == ESyntArgument::REAL)
      fdfRealToken(argv[aArgument.mIndex], aArgument.mName, CTLRX_ERR_ARGUMENTS);
  }
  const std::string aRoot = argv[9], aMaster = argv[1], aDem = argv[4];
  const std::string aInterferogram = aRoot + "_int", aOutput = aRoot + "_sint";
  const bool aWithHeight = !namesNoFile(aDem);
  note("\ninterferogram (from the output root): [%s]", aInterferogram.c_str());
  note("\nmaster power image: [%s]", aMaster.c_str());
  if (aWithHeight)
    note("\nelevation model: [%s]", aDem.c_str());
  else
    note("\nnot used: elevation model [%s]", aDem.c_str());
  for (const SSyntUnused &aArgument : CTLRX_SYNT_UNUSED)
    note("\nnot used: %s [%s]", aArgument.mName, argv[aArgument.mIndex]);
  note("\nsynthetic phase: [%s]", aOutput.c_str());

  CRunFiles aFiles;
  aFiles.addInput(aInterferogram);
  aFiles.addInput(aMaster);
  if (aWithHeight)
    aFiles.addInput(aDem);
  aFiles.addResult(aOutput, false);
  aFiles.refuseClashes(CTLRX_ERR_PARAMETER_FILE);

  CDescription aZHeader, aMasterHeader, aDemHeader;
  fdfLoadInputHeader(aInterferogram, aZHeader);
  fdfLoadInputHeader(aMaster, aMasterHeader);
  if (aWithHeight)
    fdfLoadInputHeader(aDem, aDemHeader);
  const std::string aZType = fdfHeaderText(aZHeader, "RasterInfo.CellType");
  if (aZType.find("COMPLEX") == std::string::npos) {
    fdfTraceMessage("Error: unsupported data type: %s for the interferogram %s\n", aZType.c_str(),
                    aInterferogram.c_str());
    TLRX_RAISE_F(CTLRX_ERR_IMAGES_INCOMPATIBLE, "%.64s (interferogram %.200s)", aZType.c_str(), aInterferogram.c_str());
  }
  const std::string aDemType = fdfHeaderText(aDemHeader, "RasterInfo.CellType");
  if (aWithHeight && aDemType.find("COMPLEX") != std::string::npos) {
    fdfTraceMessage("Error: unsupported data type: %s for the elevation model %s\n", aDemType.c_str(), aDem.c_str());
    TLRX_RAISE_F(CTLRX_ERR_IMAGES_INCOMPATIBLE, "%.64s (elevation model %.200s)", aDemType.c_str(), aDem.c_str());
  }
  CRasterFile aZ, aPower, aHeights;
  aZ.open_read(aInterferogram.c_str(), aZHeader);
  aPower.open_read(aMaster.c_str(), aMasterHeader);
  const int32_t aLines = aZ.getNrOfLinesPerImage(), aPixels = aZ.getNrOfPixelsPerLine();
  if (aPower.getNrOfLinesPerImage() != aLines || aPower.getNrOfPixelsPerLine() != aPixels) {
    fdfTraceMessage("Error: the master power image %s has %d x %d cells, the interferogram %d x %d\n",
                    aMaster.c_str(), aPower.getNrOfLinesPerImage(), aPower.getNrOfPixelsPerLine(), aLines, aPixels);
    TLRX_RAISE_F(CTLRX_ERR_SIZE_MISMATCH, "%.200s: %d x %d, the interferogram %d x %d", aMaster.c_str(),
                 aPower.getNrOfLinesPerImage(), aPower.getNrOfPixelsPerLine(), aLines, aPixels);
  }
  aPower.close();
  SHeightLooks aLooks;
  SNoData aNull(std::nan(""));
  if (aWithHeight) {
    aHeights.open_read(aDem.c_str(), aDemHeader);
    const int32_t aAzimuthLooks = fdfHeaderIntegerOr(aZHeader, "Processing.NAzimuthLooks", 1);
    const int32_t aRangeLooks = fdfHeaderIntegerOr(aZHeader, "Processing.NRangeLooks", 1);
    if (!fdfHeightLooks(aLines, aPixels, aHeights.getNrOfLinesPerImage(), aHeights.getNrOfPixelsPerLine(),
                        aAzimuthLooks, aRangeLooks, aLooks)) {
      fdfTraceMessage("Error: the elevation model %s has %d x %d cells, the interferogram %d x %d at %d x %d looks\n",
                      aDem.c_str(), aHeights.getNrOfLinesPerImage(), aHeights.getNrOfPixelsPerLine(), aLines, aPixels,
                      aAzimuthLooks, aRangeLooks);
      TLRX_RAISE_F(CTLRX_ERR_SIZE_MISMATCH, "%.200s: %d x %d, the interferogram %d x %d at %d x %d looks", aDem.c_str(),
                   aHeights.getNrOfLinesPerImage(), aHeights.getNrOfPixelsPerLine(), aLines, aPixels, aAzimuthLooks,
                   aRangeLooks);
    }
    const CDescriptionField *aField = aDemHeader.findField("RasterInfo.NullCellValue");
    if (aField != nullptr && aField->holdsValue())
      aNull = SNoData(aField->getDouble());
  }

  // Pass 1: the blocks.
  CSyntBlockEstimator aEstimator(aLines, aPixels, aWithHeight);
  CHeightReader aReader(aHeights, aLooks, aNull, aPixels);
  std::vector<TCell> aCells(static_cast<size_t>(aPixels));
  std::vector<uint8_t> aValid(static_cast<size_t>(aPixels));
  CLineProgress aFirst(49.0);
  for (int32_t l = 0; l < aLines; ++l) {
    aFirst.update(l, aLines);
    aZ.getComplexLine(aCells.data(), l, 0, -1, aValid.data());
    for (int32_t j = 0; j < aPixels; ++j)
      if (aValid[static_cast<size_t>(j)] == 0)
        aCells[static_cast<size_t>(j)] = TCell();
    if (aWithHeight)
      aReader.read(l);
    aEstimator.pushLine(aCells.data(), aWithHeight ? aReader.heights() : nullptr,
                        aWithHeight ? aReader.known() : nullptr);
  }
  aEstimator.finish();
  aZ.close();
  const SSyntPhaseModel aModel =
      fdfFitSyntPhase(aEstimator.blocks(), aEstimator.examined(), aLines, aPixels, aWithHeight);
  logModel(aModel, aWithHeight);

  // Pass 2: the phase, line by line.
  CDescription aHeader;
  fdfMakeResultHeader(aHeader, aZHeader, "FLOAT", "SYNTHETIC INTERFEROGRAMME", 0.0);
  // Every value is a phase, 0 included: the result declares no null value.
  aHeader.getField("RasterInfo.NullCellValue").unset();
  std::vector<std::string> aSources = {aInterferogram};
  if (aWithHeight)
    aSources.push_back(aDem);
  fdfSetHeaderList(aHeader, "RasterInfo.FilesList", aSources);
  CResultRaster aOut(aOutput, aHeader);
  std::vector<float> aPhase(static_cast<size_t>(aPixels));
  CLineProgress aSecond(49.0, 50);
  const bool aHeightTerm = aWithHeight && aModel.mHasHeight;
  for (int32_t l = 0; l < aLines; ++l) {
    aSecond.update(l, aLines);
    if (aHeightTerm)
      aReader.read(l);
    aModel.line(l, aPixels, aHeightTerm ? aReader.heights() : nullptr, aHeightTerm ? aReader.known() : nullptr,
                aPhase.data());
    aOut.file().putLine(l, aPhase.data());
  }
  if (aWithHeight)
    aHeights.close();
  aOut.commit(aHeader, CTLRX_ERR_FILE_COPY);
  return 0;
}

int tlrx_split_synt_phase_close(int argc, char ** /*argv*/) {
  if (argc < CTLRX_SYNT_CLOSE_ARGUMENTS) {
    fdfTraceMessage("\nSHUT: %d arguments, %d wanted: nothing removed\n", argc, CTLRX_SYNT_CLOSE_ARGUMENTS);
    return 0;
  }
  fdfTraceMessage("\nSHUT\n");
  return 0;
}
