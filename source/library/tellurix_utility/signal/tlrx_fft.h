// Two-dimensional complex FFTs on FFTW3 (single precision), and the matrix
// DFT that evaluates a zero-padded inverse transform at a few points only.
//
// Transforms are unnormalised, as FFTW's: forward X_k = sum_n x_n e^(-2 pi i
// k n / N), inverse x_n = sum_k X_k e^(+2 pi i k n / N), row-major arrays.
// A plan is made once per size and direction (fdfFftPlan, planning
// serialised by a mutex, since FFTW's planner is not thread-safe) and
// executed many times on other arrays through the new-array interface.
#pragma once

#include <complex>
#include <cstddef>
#include <cstdint>
#include <vector>

using TLRXComplex = std::complex<float>;

enum class ETLRXFftDirection { FORWARD, INVERSE };

struct fftwf_plan_s;

// A complex array aligned as FFTW wants it (fftwf_malloc); contents are not
// kept by resize.
class CFftBuffer {
public:
  explicit CFftBuffer(size_t theCount = 0);
  ~CFftBuffer();
  CFftBuffer(const CFftBuffer &) = delete;
  CFftBuffer &operator=(const CFftBuffer &) = delete;
  void resize(size_t theCount);
  TLRXComplex *data() const { return mData; }
  size_t size() const { return mCount; }
  TLRXComplex &operator[](size_t theIndex) const { return mData[theIndex]; }

private:
  TLRXComplex *mData = nullptr;
  size_t mCount = 0;
};

// One in-place 2-D plan of theRows x theCols. A size outside 1..2^26 cells or
// a planner failure gives an invalid plan, whose execute() fails.
class CFftPlan2D {
public:
  CFftPlan2D(int32_t theRows, int32_t theCols, ETLRXFftDirection theDirection);
  ~CFftPlan2D();
  CFftPlan2D(const CFftPlan2D &) = delete;
  CFftPlan2D &operator=(const CFftPlan2D &) = delete;

  bool isValid() const { return mPlan != nullptr; }
  int32_t rows() const { return mRows; }
  int32_t cols() const { return mCols; }
  // Transforms theData (rows x cols) in place; false for an invalid plan or
  // an array aligned otherwise than the planning one (use CFftBuffer).
  bool execute(TLRXComplex *theData) const;

private:
  fftwf_plan_s *mPlan = nullptr;
  int32_t mRows;
  int32_t mCols;
  int mAlignment = 0;
};

// The shared plan of a size and direction, made on first use and kept.
const CFftPlan2D &fdfFftPlan(int32_t theRows, int32_t theCols, ETLRXFftDirection theDirection);

// Places spectrum theIn (rows x cols) into theOut (outRows x outCols, not
// smaller) as zero padding does: frequency k keeps its signed value, the
// added frequencies are zero, and an even size's Nyquist bin is split in half
// between +N/2 and -N/2, so the padded inverse interpolates a real signal
// into a real one.
void fdfZeroPadSpectrum(const TLRXComplex *theIn, int32_t theRows, int32_t theCols, TLRXComplex *theOut,
                        int32_t theOutRows, int32_t theOutCols);

// Zoom of an inverse transform: the values sum_k X_k e^(2 pi i (kr tr / R +
// kc tc / C)) at tr = theRow + i step, tc = theCol + j step, i and j in
// -half..half, signed frequencies and the Nyquist bin split as above. With
// step = 1 / f these are the values of the zero-padded inverse transform of
// size f R x f C (unnormalised) at those points, for a cost of R C (2 half +
// 1) instead of a transform f^2 times larger.
class CDftZoom {
public:
  CDftZoom(int32_t theRows, int32_t theCols, double theStep, int32_t theHalf);
  int32_t side() const { return mSide; }
  // theOut holds side() x side() values, row-major (rows of tr).
  void evaluate(const TLRXComplex *theSpectrum, int32_t theRow, int32_t theCol, TLRXComplex *theOut);

private:
  void kernel(int32_t theSize, int32_t theCentre, const std::vector<TLRXComplex> &theSteps,
              std::vector<TLRXComplex> &theKernel) const;

  int32_t mRows;
  int32_t mCols;
  int32_t mSide;
  std::vector<TLRXComplex> mRowSteps; // e^(2 pi i k j step / R) per frequency k and point j
  std::vector<TLRXComplex> mColSteps;
  std::vector<TLRXComplex> mRowKernel;
  std::vector<TLRXComplex> mColKernel;
  std::vector<TLRXComplex> mPartial; // side x cols
};
