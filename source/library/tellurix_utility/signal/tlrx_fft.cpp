// FFT plans over FFTW3 and the matrix-DFT zoom (see tlrx_fft.h).
#include "tlrx_fft.h"

#include <fftw3.h>

#include <algorithm>
#include <cmath>
#include <map>
#include <memory>
#include <mutex>
#include <new>
#include <tuple>

namespace {

constexpr double CTLRX_TWO_PI = 6.283185307179586476925286766559;
constexpr int64_t CTLRX_FFT_MAX_CELLS = int64_t(1) << 26;

// FFTW's planner and plan destruction are not thread-safe; execution is.
std::mutex &plannerMutex() {
  static std::mutex sMutex;
  return sMutex;
}

// Signed frequency of bin k of an N-point transform; the Nyquist bin of an
// even N counts as +N/2 (it is split by the callers).
int32_t signedFrequency(int32_t theK, int32_t theN) { return 2 * theK <= theN ? theK : theK - theN; }

// a += b * c on interleaved float pairs, written out so that the compiler
// vectorises it (std::complex multiplication checks for NaN and infinity).
inline void multiplyAdd(float *theA, const float *theB, float theCr, float theCi, int32_t theCount) {
  for (int32_t i = 0; i < theCount; ++i) {
    const float aBr = theB[2 * i], aBi = theB[2 * i + 1];
    theA[2 * i] += aBr * theCr - aBi * theCi;
    theA[2 * i + 1] += aBr * theCi + aBi * theCr;
  }
}

} // namespace

// ------------------------------------------------------------------ buffer

CFftBuffer::CFftBuffer(size_t theCount) { resize(theCount); }

CFftBuffer::~CFftBuffer() { fftwf_free(mData); }

void CFftBuffer::resize(size_t theCount) {
  if (theCount == mCount)
    return;
  fftwf_free(mData);
  mData = nullptr;
  mCount = 0;
  if (theCount == 0)
    return;
  mData = static_cast<TLRXComplex *>(fftwf_malloc(theCount * sizeof(TLRXComplex)));
  if (mData == nullptr)
    throw std::bad_alloc();
  mCount = theCount;
}

// ------------------------------------------------------------------- plans

CFftPlan2D::CFftPlan2D(int32_t theRows, int32_t theCols, ETLRXFftDirection theDirection)
    : mRows(theRows), mCols(theCols) {
  if (theRows < 1 || theCols < 1 || int64_t(theRows) * theCols > CTLRX_FFT_MAX_CELLS)
    return;
  // Planned on an aligned scratch array with FFTW_ESTIMATE, which leaves the
  // array alone and plans in microseconds; executions use other arrays.
  CFftBuffer aScratch(static_cast<size_t>(theRows) * static_cast<size_t>(theCols));
  auto *aData = reinterpret_cast<fftwf_complex *>(aScratch.data());
  const std::lock_guard<std::mutex> aLock(plannerMutex());
  mPlan = fftwf_plan_dft_2d(theRows, theCols, aData, aData,
                            theDirection == ETLRXFftDirection::FORWARD ? FFTW_FORWARD : FFTW_BACKWARD, FFTW_ESTIMATE);
  mAlignment = fftwf_alignment_of(reinterpret_cast<float *>(aData));
}

CFftPlan2D::~CFftPlan2D() {
  if (mPlan == nullptr)
    return;
  const std::lock_guard<std::mutex> aLock(plannerMutex());
  fftwf_destroy_plan(mPlan);
}

bool CFftPlan2D::execute(TLRXComplex *theData) const {
  if (mPlan == nullptr || theData == nullptr || fftwf_alignment_of(reinterpret_cast<float *>(theData)) != mAlignment)
    return false;
  auto *aData = reinterpret_cast<fftwf_complex *>(theData);
  fftwf_execute_dft(mPlan, aData, aData);
  return true;
}

const CFftPlan2D &fdfFftPlan(int32_t theRows, int32_t theCols, ETLRXFftDirection theDirection) {
  using TKey = std::tuple<int32_t, int32_t, ETLRXFftDirection>;
  static std::mutex sCacheMutex;
  static std::map<TKey, std::unique_ptr<CFftPlan2D>> sPlans;
  const std::lock_guard<std::mutex> aLock(sCacheMutex);
  std::unique_ptr<CFftPlan2D> &aPlan = sPlans[TKey(theRows, theCols, theDirection)];
  if (!aPlan)
    aPlan = std::make_unique<CFftPlan2D>(theRows, theCols, theDirection);
  return *aPlan;
}

// ------------------------------------------------------------ zero padding

void fdfZeroPadSpectrum(const TLRXComplex *theIn, int32_t theRows, int32_t theCols, TLRXComplex *theOut,
                        int32_t theOutRows, int32_t theOutCols) {
  std::fill(theOut, theOut + static_cast<size_t>(theOutRows) * static_cast<size_t>(theOutCols), TLRXComplex(0, 0));
  // Each input bin lands on one output bin, or on two with half weight each.
  auto aTargets = [](int32_t theK, int32_t theN, int32_t theOutN, int32_t *theIndex, float *theWeight) {
    const int32_t aF = signedFrequency(theK, theN);
    if (theN % 2 == 0 && 2 * theK == theN && theOutN > theN) {
      theIndex[0] = aF;
      theIndex[1] = theOutN - aF;
      theWeight[0] = theWeight[1] = 0.5f;
      return 2;
    }
    theIndex[0] = aF >= 0 ? aF : theOutN + aF;
    theWeight[0] = 1.0f;
    return 1;
  };
  for (int32_t r = 0; r < theRows; ++r) {
    int32_t aRowIndex[2], aColIndex[2];
    float aRowWeight[2], aColWeight[2];
    const int32_t aRowCount = aTargets(r, theRows, theOutRows, aRowIndex, aRowWeight);
    for (int32_t c = 0; c < theCols; ++c) {
      const int32_t aColCount = aTargets(c, theCols, theOutCols, aColIndex, aColWeight);
      const TLRXComplex aValue = theIn[static_cast<size_t>(r) * theCols + c];
      for (int32_t i = 0; i < aRowCount; ++i)
        for (int32_t j = 0; j < aColCount; ++j)
          theOut[static_cast<size_t>(aRowIndex[i]) * theOutCols + aColIndex[j]] +=
              aValue * (aRowWeight[i] * aColWeight[j]);
    }
  }
}

// -------------------------------------------------------------------- zoom

namespace {

// e^(2 pi i f j step / N) for every bin and point; the Nyquist bin of an even
// N holds cos(pi j step), its two halves at +N/2 and -N/2 added.
std::vector<TLRXComplex> stepTable(int32_t theN, double theStep, int32_t theHalf) {
  const int32_t aSide = 2 * theHalf + 1;
  std::vector<TLRXComplex> aTable(static_cast<size_t>(theN) * aSide);
  for (int32_t k = 0; k < theN; ++k)
    for (int32_t j = -theHalf; j <= theHalf; ++j) {
      const double aT = j * theStep;
      const bool aNyquist = theN % 2 == 0 && 2 * k == theN;
      aTable[static_cast<size_t>(k) * aSide + (j + theHalf)] =
          aNyquist ? TLRXComplex(static_cast<float>(std::cos(CTLRX_TWO_PI * 0.5 * aT)), 0.0f)
                   : TLRXComplex(std::polar(1.0, CTLRX_TWO_PI * signedFrequency(k, theN) * aT / theN));
    }
  return aTable;
}

} // namespace

CDftZoom::CDftZoom(int32_t theRows, int32_t theCols, double theStep, int32_t theHalf)
    : mRows(theRows), mCols(theCols), mSide(2 * theHalf + 1), mRowSteps(stepTable(theRows, theStep, theHalf)),
      mColSteps(stepTable(theCols, theStep, theHalf)), mRowKernel(mRowSteps.size()), mColKernel(mColSteps.size()),
      mPartial(static_cast<size_t>(mSide) * static_cast<size_t>(theCols)) {}

// The table times the phase of the integer centre: e^(2 pi i f c / N), which
// for the Nyquist bin is (-1)^c as the split halves give.
void CDftZoom::kernel(int32_t theSize, int32_t theCentre, const std::vector<TLRXComplex> &theSteps,
                      std::vector<TLRXComplex> &theKernel) const {
  for (int32_t k = 0; k < theSize; ++k) {
    const int64_t aTurns = (int64_t(signedFrequency(k, theSize)) * theCentre) % theSize;
    const TLRXComplex aPhase(std::polar(1.0, CTLRX_TWO_PI * static_cast<double>(aTurns) / theSize));
    for (int32_t j = 0; j < mSide; ++j) {
      const size_t i = static_cast<size_t>(k) * mSide + j;
      const TLRXComplex aStep = theSteps[i];
      theKernel[i] = TLRXComplex(aPhase.real() * aStep.real() - aPhase.imag() * aStep.imag(),
                                 aPhase.real() * aStep.imag() + aPhase.imag() * aStep.real());
    }
  }
}

void CDftZoom::evaluate(const TLRXComplex *theSpectrum, int32_t theRow, int32_t theCol, TLRXComplex *theOut) {
  kernel(mRows, theRow, mRowSteps, mRowKernel);
  kernel(mCols, theCol, mColSteps, mColKernel);
  // Rows first (R x C x side), then columns (side x C x side).
  std::fill(mPartial.begin(), mPartial.end(), TLRXComplex(0, 0));
  auto *aPartial = reinterpret_cast<float *>(mPartial.data());
  const auto *aSpectrum = reinterpret_cast<const float *>(theSpectrum);
  for (int32_t r = 0; r < mRows; ++r)
    for (int32_t i = 0; i < mSide; ++i) {
      const TLRXComplex aW = mRowKernel[static_cast<size_t>(r) * mSide + i];
      multiplyAdd(aPartial + 2 * static_cast<size_t>(i) * mCols, aSpectrum + 2 * static_cast<size_t>(r) * mCols,
                  aW.real(), aW.imag(), mCols);
    }
  std::fill(theOut, theOut + static_cast<size_t>(mSide) * mSide, TLRXComplex(0, 0));
  auto *aOut = reinterpret_cast<float *>(theOut);
  const auto *aColKernel = reinterpret_cast<const float *>(mColKernel.data());
  for (int32_t i = 0; i < mSide; ++i)
    for (int32_t c = 0; c < mCols; ++c) {
      const TLRXComplex aP = mPartial[static_cast<size_t>(i) * mCols + c];
      multiplyAdd(aOut + 2 * static_cast<size_t>(i) * mSide, aColKernel + 2 * static_cast<size_t>(c) * mSide,
                  aP.real(), aP.imag(), mSide);
    }
}
