// Blocks of CTemporalSeries: runs of pixels computed together as loops over
// the pixels, which the compiler vectorises. The operations and their order
// are those of select() and features(), so the results are the same bit
// for bit; the pixels the block cannot take for sure go through those.
#include "tlrx_temporal_statistics.h"

#include "tlrx_temporal_detail.h"

#include <algorithm>
#include <cfloat>
#include <cmath>
#include <limits>

using namespace tlrx_temporal_detail;

namespace {

// Rows of SBlock::mState.
enum EBlockState { CTLRX_BS_SUM, CTLRX_BS_SQUARES, CTLRX_BS_BEST, CTLRX_BS_BEST_AT, CTLRX_BS_LOWEST,
                   CTLRX_BS_LOWEST_AT, CTLRX_BS_ROWS };

} // namespace

int32_t CTemporalSeries::blockStateRows() { return CTLRX_BS_ROWS; }

TLRX_VECTOR_CLONES void CTemporalSeries::gatherBlock(const double *theRows, size_t theStride) {
  const int32_t n = static_cast<int32_t>(mInputs.size());
  const int32_t M = mBlock.mCount;
  constexpr int32_t B = CTLRX_BLOCK_SIZE;
  double *__restrict aDoubt = mBlock.mDoubt.data();
  // Scratch rows until computeBlock.
  double *__restrict aLargest = mBlock.mState.data() + CTLRX_BS_SUM * B;
  double *__restrict aSmallest = mBlock.mState.data() + CTLRX_BS_SQUARES * B;
  const SNoData aOutputNull(mSettings.mNull);
  std::fill(aDoubt, aDoubt + M, 0.0);
  std::fill(aLargest, aLargest + M, 0.0);
  std::fill(aSmallest, aSmallest + M, std::numeric_limits<double>::infinity());
  for (int32_t j = 0; j < n; ++j) {
    const double *__restrict aRow = theRows + static_cast<size_t>(j) * theStride;
    double *__restrict aNow = mBlock.mValues.data() + static_cast<size_t>(j) * B;
    const SNoData aInputNull = mInputs[j].mNoData;
    for (int32_t m = 0; m < M; ++m) {
      const double r = aRow[m];
      const double a = std::fabs(r);
      aNow[m] = a;
      // As select(): a NaN is no data whatever the null value.
      const bool aNoData = aInputNull.isNullOrNaN(r);
      const bool aNullValued = aOutputNull.isNull(a);
      aDoubt[m] += (aNoData | aNullValued) ? 1.0 : 0.0;
      aLargest[m] = std::max(aLargest[m], a);
      aSmallest[m] = std::min(aSmallest[m], a);
    }
    if (j == 0)
      continue;
    // Kept after the previous sample, surely: far below the rate limit (the
    // selection decides the cases near it).
    const double aPerDay = mSettings.mRatioTimeThreshold * (mInputs[j].mDay - mInputs[j - 1].mDay);
    const double *__restrict aBefore = aNow - B;
    if (!(aPerDay >= DBL_MIN && aPerDay <= DBL_MAX)) {
      std::fill(aDoubt, aDoubt + M, 1.0);
      continue;
    }
    for (int32_t m = 0; m < M; ++m) {
      const double aLimit = aPerDay * aBefore[m];
      const bool aSure = (aLimit >= DBL_MIN) & (aLimit <= DBL_MAX) & (aNow[m] < aLimit * (1.0 - CTLRX_RATE_MARGIN));
      aDoubt[m] += aSure ? 0.0 : 1.0;
    }
  }
  // Sums that could reach the rescaling limit (or samples that are not
  // finite) need the accumulator's own steps. Samples from
  // CTLRX_BLOCK_SMALLEST to the limit's square root keep every feature
  // finite and within the float range (ratios and normalised values below
  // 1e37), so blocks store them by plain conversion.
  const double aInputs = n;
  for (int32_t m = 0; m < M; ++m) {
    aDoubt[m] += aInputs * std::max(aLargest[m], aLargest[m] * aLargest[m]) <= CTLRX_RESCALE_LIMIT ? 0.0 : 1.0;
    aDoubt[m] += aSmallest[m] >= CTLRX_BLOCK_SMALLEST ? 0.0 : 1.0;
  }
  // The block computes the pixels in doubt too, on a harmless series of
  // ones, so that every result of the block lies within the float range.
  for (int32_t j = 0; j < n; ++j) {
    double *__restrict aNow = mBlock.mValues.data() + static_cast<size_t>(j) * B;
    for (int32_t m = 0; m < M; ++m)
      aNow[m] = aDoubt[m] > 0.0 ? 1.0 : aNow[m];
  }
}

TLRX_VECTOR_CLONES void CTemporalSeries::computeBlock() {
  const int32_t n = static_cast<int32_t>(mInputs.size());
  const int32_t M = mBlock.mCount;
  constexpr int32_t B = CTLRX_BLOCK_SIZE;
  const double aNull = mSettings.mNull;
  const double *V = mBlock.mValues.data();
  double *aState = mBlock.mState.data();
  double *__restrict S = aState + CTLRX_BS_SUM * B;
  double *__restrict Q = aState + CTLRX_BS_SQUARES * B;
  // The running extremes are features themselves: kept in their rows.
  double *F = mBlock.mFeatures.data();
  double *__restrict aMin = F + CTLRX_TF_MIN * B;
  double *__restrict aMax = F + CTLRX_TF_MAX * B;
  double *__restrict aUp = F + CTLRX_TF_MAX_INCREMENT * B;
  double *__restrict aDown = F + CTLRX_TF_MAX_DECREMENT * B;
  double *__restrict aSteepest = F + CTLRX_TF_GRADIENT * B;
  double *__restrict aRatioUp = F + CTLRX_TF_MAX_RATIO * B;
  double *__restrict aRatioDown = F + CTLRX_TF_MIN_RATIO * B;
  double *__restrict aBest = aState + CTLRX_BS_BEST * B;
  double *__restrict aBestAt = aState + CTLRX_BS_BEST_AT * B;
  double *__restrict aLowest = aState + CTLRX_BS_LOWEST * B;
  double *__restrict aLowestAt = aState + CTLRX_BS_LOWEST_AT * B;
  const double aInf = std::numeric_limits<double>::infinity();
  // Accumulator and running quantities, sample after sample as in
  // features(). Block samples are finite, not negative and never the null
  // value, so the sums take every one of them. Selects of the form
  // "c ? x : 0" keep the loops free of branches, so they vectorise.
  for (int32_t m = 0; m < M; ++m) {
    const double v = V[m];
    S[m] = v;
    Q[m] = v * v;
    aMin[m] = aMax[m] = v;
    aUp[m] = aRatioUp[m] = -aInf;
    aDown[m] = aRatioDown[m] = aInf;
    aSteepest[m] = 0.0;
  }
  for (int32_t j = 1; j < n; ++j) {
    const double *__restrict aNow = V + static_cast<size_t>(j) * B;
    const double *__restrict aBefore = aNow - B;
    for (int32_t m = 0; m < M; ++m) {
      const double v = aNow[m];
      S[m] += v;
      Q[m] += v * v;
      aMin[m] = std::min(aMin[m], v);
      aMax[m] = std::max(aMax[m], v);
      const double aStep = v - aBefore[m];
      const double aRatio = v / aBefore[m];
      aUp[m] = std::max(aUp[m], aStep);
      aDown[m] = std::min(aDown[m], aStep);
      aSteepest[m] = std::max(aSteepest[m], std::fabs(aStep));
      aRatioUp[m] = std::max(aRatioUp[m], aRatio);
      aRatioDown[m] = std::min(aRatioDown[m], aRatio);
    }
  }
  // Positions of the first largest sample and of the first smallest before
  // it, as computeDates() finds them. Each pass compares with quantities it
  // does not change, which keeps it vectorisable; walking the samples
  // backwards, the last match is the first position. The smallest before
  // the largest is the running minimum (from the starting bound) taken at
  // the sample before it, and its first occurrence lies before the largest.
  double *__restrict aRunning = aLowestAt;
  for (int32_t m = 0; m < M; ++m) {
    aBest[m] = aMax[m];
    aBestAt[m] = -1.0;
    aLowest[m] = CTLRX_FLOAT_MAX;
    aRunning[m] = CTLRX_FLOAT_MAX;
  }
  for (int32_t j = n - 1; j >= 0; --j) {
    const double *__restrict aNow = V + static_cast<size_t>(j) * B;
    const double aAt = j;
    for (int32_t m = 0; m < M; ++m)
      aBestAt[m] = aNow[m] == aBest[m] ? aAt : aBestAt[m];
  }
  for (int32_t j = 0; j + 1 < n; ++j) {
    const double *__restrict aNow = V + static_cast<size_t>(j) * B;
    const double aNext = j + 1;
    for (int32_t m = 0; m < M; ++m) {
      aRunning[m] = std::min(aRunning[m], aNow[m]);
      aLowest[m] = aNext == aBestAt[m] ? aRunning[m] : aLowest[m];
    }
  }
  for (int32_t m = 0; m < M; ++m)
    aLowestAt[m] = -1.0;
  for (int32_t j = n - 1; j >= 0; --j) {
    const double *__restrict aNow = V + static_cast<size_t>(j) * B;
    const double aAt = j;
    for (int32_t m = 0; m < M; ++m)
      aLowestAt[m] = aNow[m] == aLowest[m] ? aAt : aLowestAt[m];
  }
  // Nothing before the largest below the starting bound: no position.
  for (int32_t m = 0; m < M; ++m)
    aLowestAt[m] = aLowest[m] < CTLRX_FLOAT_MAX ? aLowestAt[m] : -1.0;
  double *__restrict aMean = F + CTLRX_TF_MEAN * B;
  double *__restrict aStd = F + CTLRX_TF_STD * B;
  double *__restrict aSpan = F + CTLRX_TF_SPAN_DIFFERENCE * B;
  double *__restrict aSpanRatio = F + CTLRX_TF_SPAN_RATIO * B;
  const double aCount = n;
  for (int32_t m = 0; m < M; ++m) {
    // As CTemporalAccumulator: sum / count times a scale of 1.
    aMean[m] = S[m] / aCount;
    aStd[m] = Q[m] / aCount - aMean[m] * aMean[m]; // the variance, for now
    aSpan[m] = aMax[m] - aMin[m];
    aSpanRatio[m] = aMax[m] / aMin[m];
  }
  if (mSettings.mWanted[CTLRX_TF_STD])
    for (int32_t m = 0; m < M; ++m)
      aStd[m] = aStd[m] > 0.0 ? std::sqrt(aStd[m]) : 0.0;
  else
    std::fill(aStd, aStd + M, aNull);
  if (mSettings.mWanted[CTLRX_TF_MEDIAN]) {
    double *W = mBlock.mSorted.data();
    std::copy(V, V + static_cast<size_t>(n) * B, W);
    for (size_t p = 0; p < mBlock.mNetwork.size(); p += 2) {
      double *__restrict aLow = W + static_cast<size_t>(mBlock.mNetwork[p]) * B;
      double *__restrict aHigh = W + static_cast<size_t>(mBlock.mNetwork[p + 1]) * B;
      for (int32_t m = 0; m < M; ++m) {
        const double aSmaller = std::min(aLow[m], aHigh[m]);
        aHigh[m] = std::max(aLow[m], aHigh[m]);
        aLow[m] = aSmaller;
      }
    }
    const double *aMiddle = W + static_cast<size_t>((n - 1) / 2) * B;
    for (int32_t m = 0; m < M; ++m)
      F[CTLRX_TF_MEDIAN * B + m] = n == 2 ? (V[m] + V[B + m]) / 2.0 : aMiddle[m];
  } else {
    std::fill(F + CTLRX_TF_MEDIAN * B, F + CTLRX_TF_MEDIAN * B + M, aNull);
  }
  // Modifiers, value by value as in features() (every value is defined
  // here, the mean included).
  for (int f : mModified)
    for (int32_t m = 0; m < M; ++m) {
      double x = F[f * B + m];
      if (mSettings.mNormalize && f != CTLRX_TF_MEDIAN)
        x /= F[CTLRX_TF_MEAN * B + m];
      if (mSettings.mDecibels)
        x = 10.0 * std::log10(x);
      F[f * B + m] = x;
    }
  int32_t *D = mBlock.mDates.data();
  for (int32_t m = 0; m < M; ++m) {
    const int32_t aBestInput = static_cast<int32_t>(aBestAt[m]);
    const int32_t aLowestInput = static_cast<int32_t>(aLowestAt[m]);
    D[m] = aBestInput >= 0 ? mInputs[aBestInput].mFromReference : CTLRX_TF_NO_DATE;
    D[B + m] = aLowestInput >= 0 ? mInputs[aLowestInput].mFromReference : CTLRX_TF_NO_DATE;
  }
}

void CTemporalSeries::line(const double *theRows, int32_t thePixels, const STemporalLines &theLines) {
  // The written features as a short table, so the pixel loops do not look
  // at the ones left out.
  int aFeatures[CTLRX_TF_VALUE_COUNT];
  float *aValueLines[CTLRX_TF_VALUE_COUNT];
  int aWritten = 0;
  for (int f = 0; f < CTLRX_TF_VALUE_COUNT; ++f)
    if (theLines.mValue[f] != nullptr) {
      aFeatures[aWritten] = f;
      aValueLines[aWritten++] = theLines.mValue[f];
    }
  double aValues[CTLRX_TF_VALUE_COUNT];
  int32_t aDates[2];
  const size_t aStride = static_cast<size_t>(thePixels);
  const auto aOnePixel = [&](int32_t x) {
    select(theRows + x, aStride);
    features(aValues, aDates);
    for (int j = 0; j < aWritten; ++j)
      aValueLines[j][x] = fdfToFloat(aValues[aFeatures[j]]);
    for (int d = 0; d < 2; ++d)
      if (theLines.mDate[d] != nullptr)
        theLines.mDate[d][x] = aDates[d];
  };
  if (mBlock.mValues.empty()) {
    for (int32_t x = 0; x < thePixels; ++x)
      aOnePixel(x);
    return;
  }
  // Runs of pixels computed together; the pixels the block cannot take for
  // sure are then done one by one, over the block's results.
  for (int32_t x0 = 0; x0 < thePixels; x0 += CTLRX_BLOCK_SIZE) {
    const int32_t M = std::min(CTLRX_BLOCK_SIZE, thePixels - x0);
    mBlock.mCount = M;
    gatherBlock(theRows + x0, aStride);
    computeBlock();
    // Every block result lies within the float range (gatherBlock): a plain
    // conversion. The pixels in doubt are overwritten below.
    for (int j = 0; j < aWritten; ++j) {
      const double *__restrict aBlock = &mBlock.mFeatures[static_cast<size_t>(aFeatures[j]) * CTLRX_BLOCK_SIZE];
      float *__restrict aLine = aValueLines[j] + x0;
      for (int32_t m = 0; m < M; ++m)
        aLine[m] = static_cast<float>(aBlock[m]);
    }
    for (int d = 0; d < 2; ++d)
      if (theLines.mDate[d] != nullptr)
        std::copy(&mBlock.mDates[static_cast<size_t>(d) * CTLRX_BLOCK_SIZE],
                  &mBlock.mDates[static_cast<size_t>(d) * CTLRX_BLOCK_SIZE] + M, theLines.mDate[d] + x0);
    for (int32_t m = 0; m < M; ++m)
      if (mBlock.mDoubt[m] != 0.0)
        aOnePixel(x0 + m);
  }
}
