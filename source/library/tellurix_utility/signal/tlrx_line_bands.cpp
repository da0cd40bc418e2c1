// Bands of lines (see tlrx_line_bands.h).
#include "tlrx_line_bands.h"

#include <algorithm>

SBandPlan fdfBandPlan(int32_t theLines, int32_t theBlock, int theThreads, int theBlocksPerThread, int32_t theAbove,
                      int32_t theBelow) {
  SBandPlan aPlan;
  aPlan.mLines = std::max(0, theLines);
  aPlan.mBlock = std::max(1, theBlock);
  aPlan.mAbove = std::max(0, theAbove);
  aPlan.mBelow = std::max(0, theBelow);
  const int64_t aBand = int64_t(aPlan.mBlock) * std::max(1, theBlocksPerThread) * std::max(1, theThreads);
  const int64_t aImage = (int64_t(aPlan.mLines) + aPlan.mBlock - 1) / aPlan.mBlock * aPlan.mBlock;
  aPlan.mBand = static_cast<int32_t>(std::max<int64_t>(aPlan.mBlock, std::min(aBand, aImage)));
  return aPlan;
}

void fdfRunBands(const SBandPlan &thePlan, const TLRXParallelFor &theParallelFor, const TLRXBandStep &theRead,
                 const TLRXBlockStep &theCompute, const TLRXBandStep &theWrite) {
  for (int32_t aFirst = 0; aFirst < thePlan.mLines; aFirst += thePlan.mBand) {
    SLineBand aBand;
    aBand.mFirst = aFirst;
    aBand.mCount = std::min(thePlan.mBand, thePlan.mLines - aFirst);
    aBand.mInFirst = std::max(0, aFirst - thePlan.mAbove);
    aBand.mInCount = std::min(thePlan.mLines, aFirst + aBand.mCount + thePlan.mBelow) - aBand.mInFirst;
    theRead(aBand);
    const int64_t aBlocks = (aBand.mCount + thePlan.mBlock - 1) / thePlan.mBlock;
    theParallelFor(aBlocks, [&](int64_t theBlock, int theThread) {
      const int32_t aStart = aFirst + static_cast<int32_t>(theBlock) * thePlan.mBlock;
      theCompute(aStart, std::min(thePlan.mBlock, aFirst + aBand.mCount - aStart), theThread);
    });
    theWrite(aBand);
  }
}
