#include "tlrx_window_sums.h"

#include <algorithm>
#include <stdexcept>
#include <string>

namespace {

// A running window sum with its count of non-zero terms; the sum is reset to
// exactly 0 whenever the count is, which also drops any residue it carried.
struct SRunningSum {
  double mSum = 0.0;
  int32_t mNonZero = 0;

  void enter(double theTerm) {
    mSum += theTerm;
    mNonZero += theTerm != 0.0 ? 1 : 0;
  }
  void leave(double theTerm) {
    mSum -= theTerm;
    mNonZero -= theTerm != 0.0 ? 1 : 0;
    mSum = mNonZero != 0 ? mSum : 0.0;
  }
  void store(double *theSums, int32_t *theNonZero, int32_t theColumn) const {
    theSums[theColumn] = mSum;
    theNonZero[theColumn] = mNonZero;
  }
};

} // namespace

// Window [j - left, j + right] clipped to [0, P - 1], right = width - 1 - left.
// At each column that is a multiple of the width the sum starts afresh from
// the terms; within the segment that follows, column j + right enters while
// it exists and column j - left - 1 leaves once it exists. The phases are
// split so the inner loop carries no tests.
void fdfRowWindowSum(const double *theTerms, int32_t thePixels, int32_t theLeft, int32_t theWidth, double *theSums,
                     int32_t *theNonZero) {
  const int32_t aLast = thePixels - 1;
  const int32_t aRight = theWidth - 1 - theLeft;
  for (int32_t aStart = 0; aStart <= aLast; aStart += theWidth) {
    SRunningSum aRun;
    for (int32_t k = std::max(0, aStart - theLeft); k <= std::min(aLast, aStart + aRight); ++k)
      aRun.enter(theTerms[k]);
    aRun.store(theSums, theNonZero, aStart);
    const int32_t aEnd = std::min(aLast, aStart + theWidth - 1);
    int32_t j = aStart + 1;
    // Only the right end moves (the left end is still clipped at 0).
    for (; j <= std::min(aEnd, theLeft); ++j) {
      if (j + aRight <= aLast)
        aRun.enter(theTerms[j + aRight]);
      aRun.store(theSums, theNonZero, j);
    }
    // Both ends move.
    for (; j <= std::min(aEnd, aLast - aRight); ++j) {
      aRun.enter(theTerms[j + aRight]);
      aRun.leave(theTerms[j - theLeft - 1]);
      aRun.store(theSums, theNonZero, j);
    }
    // Only the left end moves (the right end is clipped at P - 1).
    for (; j <= aEnd; ++j) {
      aRun.leave(theTerms[j - theLeft - 1]);
      aRun.store(theSums, theNonZero, j);
    }
  }
}

CWindowRing::CWindowRing(const SWindowShape &theShape, int32_t theLines, int32_t thePixels, int theChannels)
    : mShape(theShape), mLines(theLines), mPixels(static_cast<size_t>(thePixels)), mChannels(theChannels),
      mSlots(static_cast<size_t>(theShape.mRows) * theChannels * mPixels, 0.0),
      mSlotNonZero(mSlots.size(), 0), mCentre(static_cast<size_t>(theShape.mRows) * mPixels, 0),
      mColumns(static_cast<size_t>(theChannels) * mPixels, 0.0), mColumnNonZero(mColumns.size(), 0),
      mTerms(mColumns.size(), 0.0) {
  for (int c = 0; c < mChannels; ++c) {
    mTermArrays.push_back(terms(c));
    mColumnArrays.push_back(column(c));
  }
}

void CWindowRing::storeLine(int32_t theLine) {
  for (int c = 0; c < mChannels; ++c)
    fdfRowWindowSum(terms(c), pixels(), mShape.left(), mShape.width(), &mSlots[slotOffset(theLine, c)],
                    &mSlotNonZero[slotOffset(theLine, c)]);
  if (mShape.mBorder == ETLRXWindowBorder::kNull)
    clearBorder(theLine);
}

// Exact windows: the pixels of the first and last R / 2 lines and K / 2
// columns are border, whatever their window would hold.
void CWindowRing::clearBorder(int32_t theLine) {
  uint8_t *aCentre = centre(theLine);
  const int32_t aHalfRows = mShape.mRows / 2;
  const int32_t aPixels = pixels();
  if (theLine < aHalfRows || theLine >= mLines - aHalfRows) {
    std::fill(aCentre, aCentre + aPixels, uint8_t{0});
    return;
  }
  const int32_t aHalfCols = std::min(mShape.mCols / 2, aPixels);
  std::fill(aCentre, aCentre + aHalfCols, uint8_t{0});
  std::fill(aCentre + std::max(0, aPixels - aHalfCols), aCentre + aPixels, uint8_t{0});
}

// One slot in or out of the accumulators; a column whose window holds no
// non-zero term is set to exactly 0.
void CWindowRing::addSlot(int32_t theLine, int theSign) {
  const double aSign = theSign;
  for (int c = 0; c < mChannels; ++c) {
    const double *aSlot = &mSlots[slotOffset(theLine, c)];
    const int32_t *aSlotNonZero = &mSlotNonZero[slotOffset(theLine, c)];
    double *aColumn = &mColumns[static_cast<size_t>(c) * mPixels];
    int32_t *aNonZero = &mColumnNonZero[static_cast<size_t>(c) * mPixels];
    for (size_t j = 0; j < mPixels; ++j) {
      aNonZero[j] += theSign * aSlotNonZero[j];
      aColumn[j] = aNonZero[j] != 0 ? aColumn[j] + aSign * aSlot[j] : 0.0;
    }
  }
}

void CWindowRing::addLine(int32_t theLine) { addSlot(theLine, 1); }

void CWindowRing::subtractLine(int32_t theLine) { addSlot(theLine, -1); }

void CWindowRing::recompute(int32_t theFirst, int32_t theLast) {
  std::fill(mColumns.begin(), mColumns.end(), 0.0);
  std::fill(mColumnNonZero.begin(), mColumnNonZero.end(), 0);
  for (int32_t aLine = theFirst; aLine <= theLast; ++aLine)
    addSlot(aLine, 1);
}

// Output line l sees lines l + below - R + 1 .. l + below: going from l - 1
// to l, line l + below - R leaves and line l + below enters. Both map to the
// same slot, so the leaving line is subtracted before the entering one is
// loaded. At lines that are multiples of R the accumulators are recomputed
// from the slots of the window instead, in line order: they then depend on
// the slots alone, which is why a run may start afresh there.
void fdfRunWindowLines(CWindowRing &theRing, int32_t theFirst, int32_t theEnd, const TLRXWindowLoad &theLoad,
                       const TLRXWindowEmit &theEmit) {
  const int32_t aRows = theRing.shape().mRows;
  const int32_t aBelow = theRing.shape().below();
  const int32_t aLines = theRing.lines();
  const bool aContinues = theFirst == theRing.mNextLine;
  if (theFirst < 0 || theEnd < theFirst || theEnd > aLines || (!aContinues && theFirst % aRows != 0))
    throw std::invalid_argument("window lines " + std::to_string(theFirst) + " .. " + std::to_string(theEnd) +
                                " of " + std::to_string(aLines) + ": a run starts at a multiple of " +
                                std::to_string(aRows) + " or where the last one ended (" +
                                std::to_string(theRing.mNextLine) + ")");
  if (!aContinues)
    theRing.mNextLoad = std::max(0, theFirst + aBelow - aRows + 1);
  // A run that fails leaves the ring to be started afresh.
  theRing.mNextLine = -1;
  int32_t aNextLoad = theRing.mNextLoad;
  for (int32_t l = theFirst; l < theEnd; ++l) {
    const bool aRecompute = l % aRows == 0;
    const int32_t aLeaving = l + aBelow - aRows;
    if (!aRecompute && aLeaving >= 0)
      theRing.subtractLine(aLeaving);
    const int32_t aLastInWindow = std::min(aLines - 1, l + aBelow);
    for (; aNextLoad <= aLastInWindow; ++aNextLoad) {
      theLoad(aNextLoad);
      theRing.storeLine(aNextLoad);
      if (!aRecompute)
        theRing.addLine(aNextLoad);
    }
    if (aRecompute)
      theRing.recompute(std::max(0, aLeaving + 1), aLastInWindow);
    theEmit(l);
  }
  theRing.mNextLoad = aNextLoad;
  theRing.mNextLine = theEnd;
}

int32_t fdfWindowBlockLines(const SWindowShape &theShape) {
  const int32_t aRows = std::max(1, theShape.mRows);
  return aRows * std::max(4, (64 + aRows - 1) / aRows);
}

// Several threads: blocks of fdfWindowBlockLines, one per thread in a band,
// which keeps the band buffers of a correlation (three inputs) of 4096 pixels
// near 25 MB for two threads. One thread: the whole image is one run of its
// ring from line 0 (the reference the blocks equal), read in bands of R lines
// so that a line is still in cache when it is used.
CWindowBands::CWindowBands(const SWindowShape &theShape, int32_t theLines, int32_t thePixels, int theChannels,
                           int theThreads, TLRXParallelFor theParallelFor)
    : mShape(theShape), mPixels(thePixels), mChannels(theChannels), mParallelFor(std::move(theParallelFor)),
      mRings(static_cast<size_t>(std::max(1, theThreads))) {
  const int32_t aBelow = theShape.below(), aAbove = theShape.mRows - 1 - aBelow;
  const int32_t aBlock = fdfWindowBlockLines(theShape);
  mPlan = theThreads > 1 ? fdfBandPlan(theLines, aBlock, theThreads, 1, aAbove, aBelow)
                         : fdfBandPlan(theLines, theShape.mRows, 1, 1, aAbove, aBelow);
}

void CWindowBands::run(const TLRXBandStep &theRead, const TLRXRingLine &theLoad, const TLRXRingLine &theEmit,
                       const TLRXBandStep &theWrite) {
  fdfRunBands(
      mPlan, mParallelFor, theRead,
      [&](int32_t theFirst, int32_t theCount, int theThread) {
        std::unique_ptr<CWindowRing> &aRing = mRings.at(static_cast<size_t>(theThread));
        if (!aRing)
          aRing = std::make_unique<CWindowRing>(mShape, mPlan.mLines, mPixels, mChannels);
        CWindowRing &aOwn = *aRing;
        fdfRunWindowLines(
            aOwn, theFirst, theFirst + theCount, [&](int32_t theLine) { theLoad(aOwn, theLine, theThread); },
            [&](int32_t theLine) { theEmit(aOwn, theLine, theThread); });
      },
      theWrite);
}
