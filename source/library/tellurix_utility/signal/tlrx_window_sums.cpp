#include "tlrx_window_sums.h"

#include <algorithm>

// Sum over the window [j - h, j + h] clipped to [0, P - 1]: the first window
// holds columns 0 .. min(h, P - 1); then column j + h enters while it exists
// and column j - h - 1 leaves once it exists. The three phases are split so
// the inner loop carries no tests. No data: the measures give no-data pixels
// a term of 0, so they add nothing; column 0 is no exception.
void fdfRowWindowSum(const double *theTerms, int32_t thePixels, int32_t theHalf, double *theSums) {
  if (thePixels <= 0)
    return;
  const int32_t aLast = thePixels - 1;
  double aSum = 0.0;
  for (int32_t k = 0; k <= std::min(theHalf, aLast); ++k)
    aSum += theTerms[k];
  theSums[0] = aSum;
  // Columns where only the right end moves (the left end is still 0).
  const int32_t aGrowEnd = std::min(theHalf, aLast);
  int32_t j = 1;
  for (; j <= aGrowEnd; ++j) {
    if (j + theHalf <= aLast)
      aSum += theTerms[j + theHalf];
    theSums[j] = aSum;
  }
  // Both ends move.
  for (; j + theHalf <= aLast; ++j) {
    aSum += theTerms[j + theHalf] - theTerms[j - theHalf - 1];
    theSums[j] = aSum;
  }
  // Only the left end moves (the right end is clipped at P - 1).
  for (; j <= aLast; ++j) {
    aSum -= theTerms[j - theHalf - 1];
    theSums[j] = aSum;
  }
}

CWindowRing::CWindowRing(int32_t theRows, int32_t theCols, int32_t thePixels, int theChannels)
    : mRows(theRows), mCols(theCols), mPixels(static_cast<size_t>(thePixels)), mChannels(theChannels),
      mSlots(static_cast<size_t>(theRows) * theChannels * mPixels, 0.0),
      mCentre(static_cast<size_t>(theRows) * mPixels, 0), mColumns(static_cast<size_t>(theChannels) * mPixels, 0.0),
      mTerms(static_cast<size_t>(theChannels) * mPixels, 0.0) {}

void CWindowRing::storeLine(int32_t theLine) {
  for (int c = 0; c < mChannels; ++c)
    fdfRowWindowSum(terms(c), static_cast<int32_t>(mPixels), halfCols(), slot(theLine, c));
}

void CWindowRing::addLine(int32_t theLine) {
  for (int c = 0; c < mChannels; ++c) {
    const double *aSlot = slot(theLine, c);
    double *aColumn = &mColumns[static_cast<size_t>(c) * mPixels];
    for (size_t j = 0; j < mPixels; ++j)
      aColumn[j] += aSlot[j];
  }
}

void CWindowRing::subtractLine(int32_t theLine) {
  for (int c = 0; c < mChannels; ++c) {
    const double *aSlot = slot(theLine, c);
    double *aColumn = &mColumns[static_cast<size_t>(c) * mPixels];
    for (size_t j = 0; j < mPixels; ++j)
      aColumn[j] -= aSlot[j];
  }
}

// Output line l sees lines l + hr - R + 1 .. l + hr: going from l - 1 to l,
// line l + hr - R leaves and line l + hr enters. Both map to the same slot,
// so the leaving line is subtracted before the entering one is loaded.
void fdfRunWindowSchedule(CWindowRing &theRing, int32_t theLines, const TLRXWindowLoad &theLoad,
                          const TLRXWindowEmit &theEmit, const TLRXWindowProgress &theProgress) {
  const int32_t aHalf = theRing.halfRows();
  const int32_t aRows = theRing.rows();
  int32_t aNextLoad = 0;
  for (int32_t l = 0; l < theLines; ++l) {
    if (theProgress)
      theProgress(l, theLines);
    const int32_t aLeaving = l + aHalf - aRows;
    if (aLeaving >= 0)
      theRing.subtractLine(aLeaving);
    const int32_t aLastInWindow = std::min(theLines - 1, l + aHalf);
    for (; aNextLoad <= aLastInWindow; ++aNextLoad) {
      theLoad(aNextLoad);
      theRing.storeLine(aNextLoad);
      theRing.addLine(aNextLoad);
    }
    theEmit(l);
  }
}
