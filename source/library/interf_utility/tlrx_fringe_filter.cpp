// Fringe-adaptive filter (see tlrx_fringe_filter.h): the patch kernel and the
// step program that streams an interferogram through it.
#include "tlrx_fringe_filter.h"

#include <algorithm>
#include <cmath>
#include <stdexcept>
#include <string>

#include "tlrx_description_section.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_raster_file.h"
#include "tlrx_result_files.h"
#include "tlrx_step_common.h"
#include "tlrx_threads.h"

namespace {

using TCell = std::complex<float>;

constexpr int32_t CTLRX_FRINGE_MASK = CTLRX_FRINGE_PATCH - 1;
constexpr int32_t CTLRX_FRINGE_CELLS = CTLRX_FRINGE_PATCH * CTLRX_FRINGE_PATCH;
constexpr int32_t CTLRX_FRINGE_PEAK = 4;
constexpr double CTLRX_FRINGE_KAISER_BETA = 2.1;
constexpr double CTLRX_FRINGE_MAX_SNR = 1e30;
constexpr double CTLRX_FRINGE_PI = 3.14159265358979323846;

// Modified Bessel function I0 by its power series (converges fast for the
// small arguments of the taper).
double besselI0(double theX) {
  double aSum = 1.0, aTerm = 1.0;
  for (int k = 1; k < 40; ++k) {
    aTerm *= (theX / (2.0 * k)) * (theX / (2.0 * k));
    aSum += aTerm;
  }
  return aSum;
}

bool isNoData(const TCell &theCell) {
  return theCell == TCell() || !std::isfinite(theCell.real()) || !std::isfinite(theCell.imag());
}

} // namespace

// ------------------------------------------------------------ kernel

CFringeFilter::CFringeFilter(int32_t thePixels, double theLowSnr, double theWidth, int32_t theRows)
    : mPixels(thePixels), mLowSnr(theLowSnr), mRows(theRows),
      mInputLines(CTLRX_FRINGE_STEP * (theRows + 1)), mSumLines(CTLRX_FRINGE_STEP * (theRows + 2)),
      mForward(fdfFftPlan(CTLRX_FRINGE_PATCH, CTLRX_FRINGE_PATCH, ETLRXFftDirection::FORWARD)),
      mInverse(fdfFftPlan(CTLRX_FRINGE_PATCH, CTLRX_FRINGE_PATCH, ETLRXFftDirection::INVERSE)) {
  if (thePixels < 1 || !(theWidth >= 0.0) || !std::isfinite(theWidth) || theRows < 1 || theRows > 64)
    throw std::invalid_argument("CFringeFilter: pixels must be at least 1, the width finite and not negative and "
                                "the patch rows from 1 to 64");
  if (!mForward.isValid() || !mInverse.isValid())
    throw std::runtime_error("CFringeFilter: no FFT plan for 32 x 32 patches");
  const double aTaperNorm = besselI0(CTLRX_FRINGE_KAISER_BETA);
  for (int32_t d = -CTLRX_FRINGE_PATCH / 2; d < CTLRX_FRINGE_PATCH / 2; ++d) {
    const double aX = theWidth * d / CTLRX_FRINGE_PATCH;
    const double aSinc = aX == 0.0 ? 1.0 : std::sin(CTLRX_FRINGE_PI * aX) / (CTLRX_FRINGE_PI * aX);
    const double aR = 2.0 * d / CTLRX_FRINGE_PATCH;
    const double aTaper = besselI0(CTLRX_FRINGE_KAISER_BETA * std::sqrt(std::max(0.0, 1.0 - aR * aR))) / aTaperNorm;
    const double aGain = theWidth == 0.0 ? 1.0 : aSinc * aTaper;
    // 1 / 32 per axis is the normalisation of the inverse transform.
    mPassBand[static_cast<size_t>(d & CTLRX_FRINGE_MASK)] = static_cast<float>(aGain / CTLRX_FRINGE_PATCH);
  }
  for (int32_t n = 0; n < CTLRX_FRINGE_PATCH; ++n) {
    const double aS = std::sin(CTLRX_FRINGE_PI * (n + 0.5) / CTLRX_FRINGE_PATCH);
    mWeight[static_cast<size_t>(n)] = static_cast<float>(aS * aS);
  }
  mInput.assign(static_cast<size_t>(mInputLines) * static_cast<size_t>(thePixels), TCell());
  mSum.assign(static_cast<size_t>(mSumLines) * static_cast<size_t>(thePixels), TCell());
  // Patches start every 16 columns from -16.
  const size_t aPatches = static_cast<size_t>(thePixels + CTLRX_FRINGE_STEP - 1) / CTLRX_FRINGE_STEP + 1;
  mColumns = static_cast<int32_t>(aPatches);
  mPatches.resize(static_cast<size_t>(theRows) * aPatches * CTLRX_FRINGE_CELLS);
  mPatchResults.resize(static_cast<size_t>(theRows) * aPatches);
}

double CFringeFilter::passBand(int32_t theOffset) const {
  return static_cast<double>(mPassBand[static_cast<size_t>(theOffset & CTLRX_FRINGE_MASK)]) * CTLRX_FRINGE_PATCH;
}

TCell *CFringeFilter::inputLine(int32_t theLine) {
  return &mInput[static_cast<size_t>(theLine % mInputLines) * static_cast<size_t>(mPixels)];
}

const TCell *CFringeFilter::inputLine(int32_t theLine) const {
  return &mInput[static_cast<size_t>(theLine % mInputLines) * static_cast<size_t>(mPixels)];
}

TCell *CFringeFilter::sumLine(int32_t theLine) {
  const int32_t aSlot = ((theLine % mSumLines) + mSumLines) % mSumLines;
  return &mSum[static_cast<size_t>(aSlot) * static_cast<size_t>(mPixels)];
}

void CFringeFilter::requireTaken() const {
  // The accumulator ring reuses the lines of the previous band.
  if (mNextOut < mFinal)
    throw std::logic_error("CFringeFilter: filtered lines not taken before the next input");
}

int32_t CFringeFilter::pushLine(const TCell *theLine) {
  requireTaken();
  if (mFinished)
    throw std::logic_error("CFringeFilter: line pushed after finish");
  TCell *aDest = inputLine(mPushed);
  // A non-finite cell would spread over its four patches: it is no data.
  for (int32_t j = 0; j < mPixels; ++j)
    aDest[j] = isNoData(theLine[j]) ? TCell() : theLine[j];
  ++mPushed;
  if (mNextBand + CTLRX_FRINGE_STEP * (mRows + 1) == mPushed)
    processBands(mNextBand, mRows);
  return mFinal - mNextOut;
}

int32_t CFringeFilter::finish() {
  requireTaken();
  if (!mFinished) {
    mFinished = true;
    while (mNextBand < mPushed)
      processBands(mNextBand, std::min(mRows, (mPushed - mNextBand + CTLRX_FRINGE_STEP - 1) / CTLRX_FRINGE_STEP));
  }
  return mFinal - mNextOut;
}

void CFringeFilter::popLine(TCell *theLine) {
  if (mNextOut >= mFinal)
    throw std::logic_error("CFringeFilter: no filtered line ready");
  const TCell *aSum = sumLine(mNextOut++);
  std::copy(aSum, aSum + mPixels, theLine);
}

// The patch rows starting at theStart + 16 k, k < theRows: lines from
// theStart + 16 on get their first contribution, lines theStart..theStart +
// 16 theRows - 1 their last. Patches are filtered in parallel; each line then
// adds them row after row, each row in column order, as one patch after the
// other would.
void CFringeFilter::processBands(int32_t theStart, int32_t theRows) {
  const int32_t aReach = theStart + CTLRX_FRINGE_STEP * (theRows - 1) + CTLRX_FRINGE_PATCH;
  for (int32_t y = theStart + CTLRX_FRINGE_STEP; y < aReach; ++y)
    std::fill(sumLine(y), sumLine(y) + mPixels, TCell());
  const int64_t aColumns = mColumns, aPatches = aColumns * theRows;
  for (size_t t = mPower.size(); t < static_cast<size_t>(fdfThreadCount()); ++t)
    mPower.emplace_back(static_cast<size_t>(CTLRX_FRINGE_CELLS));
  fdfParallelFor(aPatches, [&](int64_t theIndex, int theThread) {
    const size_t i = static_cast<size_t>(theIndex);
    const int32_t aRow = static_cast<int32_t>(theIndex / aColumns), aColumn = static_cast<int32_t>(theIndex % aColumns);
    filterPatch(theStart + aRow * CTLRX_FRINGE_STEP, aColumn * CTLRX_FRINGE_STEP - CTLRX_FRINGE_STEP,
                mPatches.data() + i * CTLRX_FRINGE_CELLS, mPower[static_cast<size_t>(theThread)].data(),
                mPatchResults[i]);
  });
  for (int64_t i = 0; i < aPatches; ++i) {
    const SPatchResult &aResult = mPatchResults[static_cast<size_t>(i)];
    if (aResult.mAny) {
      ++mStats.mPatches;
      mStats.mAboveThreshold += aResult.mAtPeak ? 1 : 0;
      mStats.mSnrSum += aResult.mSnr;
    }
  }
  const int32_t aFirst = std::max(theStart, 0), aLast = std::min(aReach, mPushed);
  fdfParallelFor(std::max(0, aLast - aFirst), [&](int64_t theLine, int) {
    const int32_t r = aFirst + static_cast<int32_t>(theLine);
    TCell *aSum = sumLine(r);
    for (int32_t aRow = 0; aRow < theRows; ++aRow) {
      const int32_t i = r - theStart - aRow * CTLRX_FRINGE_STEP;
      if (i < 0 || i >= CTLRX_FRINGE_PATCH)
        continue;
      for (int64_t c = 0; c < aColumns; ++c) {
        const size_t p = static_cast<size_t>(aRow * aColumns + c);
        if (!mPatchResults[p].mAny)
          continue;
        const int32_t aCol = static_cast<int32_t>(c) * CTLRX_FRINGE_STEP - CTLRX_FRINGE_STEP;
        const int32_t aColFrom = std::max(0, -aCol), aColTo = std::min(CTLRX_FRINGE_PATCH, mPixels - aCol);
        const TCell *aOut = mPatches.data() + p * CTLRX_FRINGE_CELLS + i * CTLRX_FRINGE_PATCH;
        for (int32_t j = aColFrom; j < aColTo; ++j)
          aSum[aCol + j] += aOut[j];
      }
    }
  });
  const int32_t aEnd = std::min(theStart + CTLRX_FRINGE_STEP * theRows, mPushed);
  for (int32_t y = std::max(theStart, 0); y < aEnd; ++y) {
    const TCell *aIn = inputLine(y);
    TCell *aSum = sumLine(y);
    for (int32_t j = 0; j < mPixels; ++j)
      if (aIn[j] == TCell())
        aSum[j] = TCell();
  }
  mFinal = std::max(mFinal, aEnd);
  mNextBand = theStart + CTLRX_FRINGE_STEP * theRows;
}

void CFringeFilter::filterPatch(int32_t theRow, int32_t theCol, TCell *thePatch, float *thePower,
                                SPatchResult &theResult) const {
  const int32_t aColFrom = std::max(0, -theCol), aColTo = std::min(CTLRX_FRINGE_PATCH, mPixels - theCol);
  TCell *aPatch = thePatch;
  std::fill(aPatch, aPatch + CTLRX_FRINGE_CELLS, TCell());
  bool aAny = false;
  for (int32_t i = 0; i < CTLRX_FRINGE_PATCH; ++i) {
    const int32_t r = theRow + i;
    if (r < 0 || r >= mPushed)
      continue;
    const TCell *aIn = inputLine(r) + theCol;
    for (int32_t j = aColFrom; j < aColTo; ++j) {
      aPatch[i * CTLRX_FRINGE_PATCH + j] = aIn[j];
      aAny = aAny || aIn[j] != TCell();
    }
  }
  theResult = SPatchResult();
  if (!aAny)
    return; // nothing to add, and not counted as a patch
  mForward.execute(aPatch);

  double aTotal = 0.0;
  int32_t aPeak = 0;
  for (int32_t k = 0; k < CTLRX_FRINGE_CELLS; ++k) {
    thePower[k] = std::norm(aPatch[k]);
    aTotal += thePower[k];
    if (thePower[k] > thePower[aPeak])
      aPeak = k;
  }
  const int32_t aPr = aPeak / CTLRX_FRINGE_PATCH, aPc = aPeak % CTLRX_FRINGE_PATCH;
  const auto aPower = [&](int32_t theR, int32_t theC) {
    return thePower[(theR & CTLRX_FRINGE_MASK) * CTLRX_FRINGE_PATCH + (theC & CTLRX_FRINGE_MASK)];
  };
  // The 4 x 4 window reaches two bins towards the stronger neighbour, where
  // a fringe between two bins leaks most.
  const int32_t aR0 = aPower(aPr + 1, aPc) >= aPower(aPr - 1, aPc) ? aPr - 1 : aPr - 2;
  const int32_t aC0 = aPower(aPr, aPc + 1) >= aPower(aPr, aPc - 1) ? aPc - 1 : aPc - 2;
  double aPeakPower = 0.0;
  for (int32_t a = 0; a < CTLRX_FRINGE_PEAK; ++a)
    for (int32_t b = 0; b < CTLRX_FRINGE_PEAK; ++b)
      aPeakPower += aPower(aR0 + a, aC0 + b);
  // The whole patch's power as the reference: a single-look fringe then has
  // an SNR of about g^2, so a threshold of 0.25 means a coherence near 0.5.
  const double aNoise = aTotal;
  const double aShare = static_cast<double>(CTLRX_FRINGE_PEAK * CTLRX_FRINGE_PEAK) / CTLRX_FRINGE_CELLS;
  double aSnr = aNoise > 0.0 ? (aPeakPower - aNoise * aShare) / aNoise : CTLRX_FRINGE_MAX_SNR;
  aSnr = std::min(aSnr, CTLRX_FRINGE_MAX_SNR);
  const bool aAtPeak = aSnr >= mLowSnr;
  theResult = SPatchResult{true, aAtPeak, aSnr};

  const int32_t aCr = aAtPeak ? aPr : 0, aCc = aAtPeak ? aPc : 0;
  for (int32_t kr = 0; kr < CTLRX_FRINGE_PATCH; ++kr) {
    const float aRowGain = mPassBand[static_cast<size_t>((kr - aCr) & CTLRX_FRINGE_MASK)];
    TCell *aRow = aPatch + kr * CTLRX_FRINGE_PATCH;
    for (int32_t kc = 0; kc < CTLRX_FRINGE_PATCH; ++kc)
      aRow[kc] *= aRowGain * mPassBand[static_cast<size_t>((kc - aCc) & CTLRX_FRINGE_MASK)];
  }
  mInverse.execute(aPatch);

  // Weighted for the overlap-add; the rows and columns outside the image
  // are never added.
  for (int32_t i = 0; i < CTLRX_FRINGE_PATCH; ++i) {
    const float aRowWeight = mWeight[static_cast<size_t>(i)];
    TCell *aOut = aPatch + i * CTLRX_FRINGE_PATCH;
    for (int32_t j = aColFrom; j < aColTo; ++j)
      aOut[j] = aOut[j] * (aRowWeight * mWeight[static_cast<size_t>(j)]);
  }
}

// ------------------------------------------------------------ step program

namespace {

constexpr const char *CTLRX_FRINGE_BANNER = "*** fringe adaptive filter of the interferogram ***\n";
constexpr const char *CTLRX_FRINGE_FLATTENED = "FLATTENED INTERFEROGRAMME";
// Patch rows filtered together with several threads: a parallel loop of this
// many rows of patches is long enough to be worth starting.
constexpr int32_t CTLRX_FRINGE_STEP_ROWS = 8;

struct SFringeArguments {
  const char *mInput = nullptr;
  const char *mOutput = nullptr;
  double mLowSnr = 0.0;
  double mWidth = 0.0;
};

SFringeArguments readArguments(int argc, char **argv) {
  if (argc < 5) {
    fdfTraceMessage("Usage: %s interferogram filtered_interferogram low_snr_threshold width_pixels (%d arguments "
                    "given)\n",
                    argc > 0 ? argv[0] : "tlrx_fringe_filter", argc > 0 ? argc - 1 : 0);
    TLRX_RAISE(CTLRX_ERR_ARGUMENTS, nullptr);
  }
  SFringeArguments a;
  a.mInput = argv[1];
  a.mOutput = argv[2];
  a.mLowSnr = fdfRealToken(argv[3], "low SNR threshold", CTLRX_ERR_ARGUMENTS);
  a.mWidth = fdfRealToken(argv[4], "width", CTLRX_ERR_ARGUMENTS);
  if (!(a.mWidth > 0.0)) {
    fdfTraceMessage("Error: the width must be above 0 pixels [%s]\n", argv[4]);
    TLRX_RAISE_F(CTLRX_ERR_ARGUMENTS, "width: not above 0 [%.200s]", argv[4]);
  }
  fdfTraceMessage("interferogram: %s\nfiltered interferogram: %s\nlow SNR threshold: %g\nwidth: %g pixels\n",
                  a.mInput, a.mOutput, a.mLowSnr, a.mWidth);
  return a;
}

} // namespace

int tlrx_fringe_filter(int argc, char **argv) {
  fdfTraceMessage("%s", CTLRX_FRINGE_BANNER);
  const SFringeArguments aArgs = readArguments(argc, argv);
  CRunFiles aFiles;
  aFiles.addInput(aArgs.mInput);
  aFiles.addResult(aArgs.mOutput, false);
  aFiles.refuseClashes(CTLRX_ERR_PARAMETER_FILE);

  CDescription aHeader;
  fdfLoadInputHeader(aArgs.mInput, aHeader);
  const std::string aCellType = fdfHeaderText(aHeader, "RasterInfo.CellType");
  if (aCellType != "FLOAT_COMPLEX") {
    fdfTraceMessage("Error: unsupported data type: %s for input file 1\n", aCellType.c_str());
    fdfLogMessage("Error: unsupported data type: %s for input file 1\n", aCellType.c_str());
    TLRX_RAISE_F(CTLRX_ERR_IMAGES_INCOMPATIBLE, "%.64s (input file 1: %.200s)", aCellType.c_str(), aArgs.mInput);
  }
  CRasterFile aInput;
  aInput.open_read(aArgs.mInput, aHeader);
  const int32_t aLines = aInput.getNrOfLinesPerImage(), aPixels = aInput.getNrOfPixelsPerLine();
  fdfTraceMessage("image size: %d lines x %d pixels\n", aLines, aPixels);

  CDescription aResultHeader;
  const bool aFlattened = fdfHeaderText(aHeader, "RasterInfo.DataUnits") == CTLRX_FRINGE_FLATTENED;
  fdfMakeResultHeader(aResultHeader, aHeader, "FLOAT_COMPLEX", aFlattened ? nullptr : "INTERFEROGRAMME", 0.0);
  fdfSetHeaderList(aResultHeader, "RasterInfo.FilesList", {aArgs.mInput});
  CResultRaster aResult(aArgs.mOutput, aResultHeader);

  // One thread gains nothing from rows filtered together, and the patches
  // of one row stay in cache; the result is the same either way.
  CFringeFilter aFilter(aPixels, aArgs.mLowSnr, aArgs.mWidth, fdfThreadCount() > 1 ? CTLRX_FRINGE_STEP_ROWS : 1);
  std::vector<TCell> aLine(static_cast<size_t>(aPixels)), aFiltered(static_cast<size_t>(aPixels));
  std::vector<uint8_t> aValid(static_cast<size_t>(aPixels));
  int32_t aWritten = 0;
  const auto aTake = [&](int32_t theReady) {
    for (int32_t i = 0; i < theReady; ++i) {
      aFilter.popLine(aFiltered.data());
      aResult.file().putComplexLine(aWritten++, aFiltered.data());
    }
  };
  CLineProgress aProgress(99.0);
  for (int32_t y = 0; y < aLines; ++y) {
    aProgress.update(y, aLines);
    // The input's no-data cells are 0 + 0i, the chain's no data.
    aInput.getComplexLine(aLine.data(), y, 0, -1, aValid.data());
    for (size_t j = 0; j < aValid.size(); ++j)
      if (aValid[j] == 0)
        aLine[j] = TCell();
    aTake(aFilter.pushLine(aLine.data()));
  }
  aTake(aFilter.finish());
  aInput.close();
  aResult.commit(aResultHeader, CTLRX_ERR_FILE_COPY);

  const SFringeFilterStats &aStats = aFilter.stats();
  fdfLogMessage("\nfringe filter: %lld of %lld patches above the low SNR threshold %g (%.1f %%)\n",
                static_cast<long long>(aStats.mAboveThreshold), static_cast<long long>(aStats.mPatches), aArgs.mLowSnr,
                aStats.mPatches > 0 ? 100.0 * static_cast<double>(aStats.mAboveThreshold) / aStats.mPatches : 0.0);
  return 0;
}
