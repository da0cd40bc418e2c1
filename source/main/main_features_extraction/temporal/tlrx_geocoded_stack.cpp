#include "tlrx_geocoded_stack.h"

#include "tlrx_description_section.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"
#include "tlrx_raster_file.h"
#include "tlrx_standard_header.h"

#include <algorithm>
#include <cmath>
#include <limits>

// One input: its raster, registration, ring of lines and the kernel taps of
// the output columns (per kernel of the chain) and of the current line.
struct CGeocodedImageStack::SInput {
  std::string mName;
  CRasterFile mFile;
  SMapGrid mGrid;
  double mNull = 0.0;
  // Output columns [mColBegin, mColEnd) have their centre inside the input.
  int32_t mColBegin = 0;
  int32_t mColEnd = 0;
  std::vector<int32_t> mColStride;              // per level: taps stored per column
  std::vector<std::vector<int32_t>> mColFirst;  // per level, per column
  std::vector<std::vector<double>> mColWeight;  // per level, per column x stride
  // Ring: line j lives in slot j % mSlots.
  int32_t mSlots = 1;
  std::vector<double> mRing;
  std::vector<int32_t> mSlotLine;
  // Per slot, the no-data cells before each position (mPixels + 1 counts),
  // so that a support's cells are known free of no data in two reads.
  std::vector<int32_t> mNullsBefore;
  // Current output line.
  int32_t mLine = -1;
  bool mRowInside = false;
  std::vector<SKernelTaps> mRowTaps; // per level

  SNoData mNoData;

  // No data, or not a number whatever the null value (as the temporal
  // features count it): nothing to interpolate from.
  bool isNull(double theValue) const { return mNoData.isNullOrNaN(theValue); }
  int32_t *nullsBefore(int32_t theLine) {
    return &mNullsBefore[static_cast<size_t>(theLine % mSlots) * (static_cast<size_t>(mGrid.mPixels) + 1)];
  }
  const int32_t *nullsBefore(int32_t theLine) const {
    return &mNullsBefore[static_cast<size_t>(theLine % mSlots) * (static_cast<size_t>(mGrid.mPixels) + 1)];
  }
  const double *line(int32_t theLine) const {
    return &mRing[static_cast<size_t>(theLine % mSlots) * static_cast<size_t>(mGrid.mPixels)];
  }
};

namespace {

// Half the footprint of an output cell of spacing theStep on an input axis of
// spacing theInputStep, in input cells.
double fdfHalfFootprint(int32_t theWindow, double theStep, double theInputStep) {
  return 0.5 * theWindow * std::fabs(theStep / theInputStep);
}

bool fdfTaps(ETLRXKernel theKernel, double thePosition, double theHalf, SKernelTaps &theTaps) {
  if (fdfIsFootprintKernel(theKernel))
    return fdfFootprintTaps(theKernel, thePosition, theHalf, theTaps);
  fdfInterpolationTaps(theKernel, thePosition, theTaps);
  return true;
}

} // namespace

CGeocodedImageStack::CGeocodedImageStack() = default;
CGeocodedImageStack::~CGeocodedImageStack() = default;

void CGeocodedImageStack::release() {
  for (auto &aInput : mInputs)
    aInput->mFile.close();
  mInputs.clear();
  mNulls.clear();
  mChain.clear();
}

bool CGeocodedImageStack::initialise(const char *theListFile, const char *theGridHeader, const char *theInterpType,
                                     int32_t theWindow, int32_t theClip) {
  release();
  const std::vector<std::string> aNames = fdfReadNameList(theListFile);
  if (aNames.empty()) {
    fdfTraceMessage("Geocoded stack: no input in %s\n", theListFile);
    return false;
  }
  CDescription aGridHeader;
  fdfReadStandardHeader(theGridHeader, aGridHeader);
  std::string aProblem;
  if (!fdfReadMapGrid(aGridHeader, mGrid, aProblem)) {
    fdfTraceMessage("Geocoded stack: grid %s without a usable %s\n", theGridHeader, aProblem.c_str());
    return false;
  }
  bool aKnown = false;
  mKernel = fdfKernelFromName(theInterpType != nullptr ? theInterpType : "", aKnown);
  if (!aKnown)
    fdfTraceMessage("Geocoded stack: interpolation [%s] unknown, %s used\n", theInterpType != nullptr ? theInterpType : "",
                    fdfKernelName(mKernel));
  mChain.assign(1, mKernel);
  if (!fdfIsFootprintKernel(mKernel))
    while (mChain.back() != ETLRXKernel::NEAREST)
      mChain.push_back(fdfKernelFallback(mChain.back()));
  mWindow = std::max(theWindow, 1);
  mClip = theClip != 0;
  for (const std::string &aName : aNames)
    if (!addInput(aName)) {
      release();
      return false;
    }
  return true;
}

bool CGeocodedImageStack::addInput(const std::string &theName) {
  auto aInput = std::make_unique<SInput>();
  SInput &aIn = *aInput;
  aIn.mName = theName;
  CDescription aHeader;
  fdfReadStandardHeader(theName.c_str(), aHeader);
  std::string aProblem;
  if (!fdfReadMapGrid(aHeader, aIn.mGrid, aProblem)) {
    fdfTraceMessage("Geocoded stack: %s without a usable %s\n", theName.c_str(), aProblem.c_str());
    return false;
  }
  aIn.mFile.open_read(theName.c_str(), aHeader);
  aIn.mNull = aIn.mFile.getDummyVal();
  aIn.mNoData = aIn.mFile.getNoData();
  // The header's size is the one the raster file checked against the data.
  aIn.mGrid.mLines = aIn.mFile.getNrOfLinesPerImage();
  aIn.mGrid.mPixels = aIn.mFile.getNrOfPixelsPerLine();

  const int32_t aLevels = static_cast<int32_t>(mChain.size());
  const double aHalfPixel = fdfHalfFootprint(mWindow, mGrid.mEastStep, aIn.mGrid.mEastStep);
  const double aHalfLine = fdfHalfFootprint(mWindow, mGrid.mNorthStep, aIn.mGrid.mNorthStep);
  aIn.mColBegin = mGrid.mPixels;
  aIn.mColEnd = 0;
  for (int32_t c = 0; c < mGrid.mPixels; ++c) {
    const double w = fdfCellCentrePosition(c, mGrid.mEast0, mGrid.mEastStep, aIn.mGrid.mEast0, aIn.mGrid.mEastStep);
    if (w >= -0.5 && w < aIn.mGrid.mPixels - 0.5) {
      aIn.mColBegin = std::min(aIn.mColBegin, c);
      aIn.mColEnd = c + 1;
    }
  }
  const int32_t aColumns = std::max(aIn.mColEnd - aIn.mColBegin, 0);
  aIn.mColStride.resize(aLevels);
  aIn.mColFirst.resize(aLevels);
  aIn.mColWeight.resize(aLevels);
  aIn.mRowTaps.resize(aLevels);
  aIn.mSlots = 1;
  for (int32_t aLevel = 0; aLevel < aLevels; ++aLevel) {
    const ETLRXKernel aKernel = mChain[aLevel];
    // Footprints span at most this many cells; interpolating kernels a fixed count.
    const int32_t aLineTaps = fdfIsFootprintKernel(aKernel) ? static_cast<int32_t>(2 * aHalfLine) + 2
                                                            : fdfKernelTapCount(aKernel);
    const int32_t aPixelTaps = fdfIsFootprintKernel(aKernel) ? static_cast<int32_t>(2 * aHalfPixel) + 2
                                                             : fdfKernelTapCount(aKernel);
    if (aLineTaps > CTLRX_KERNEL_MAX_TAPS || aPixelTaps > CTLRX_KERNEL_MAX_TAPS) {
      fdfTraceMessage("Geocoded stack: footprint of %d x %d cells in %s exceeds %d\n", aLineTaps, aPixelTaps,
                      theName.c_str(), CTLRX_KERNEL_MAX_TAPS);
      return false;
    }
    aIn.mSlots = std::max(aIn.mSlots, aLineTaps);
    aIn.mColStride[aLevel] = aPixelTaps;
    aIn.mColFirst[aLevel].assign(aColumns, 0);
    aIn.mColWeight[aLevel].assign(static_cast<size_t>(aColumns) * aPixelTaps, 0.0);
    for (int32_t c = aIn.mColBegin; c < aIn.mColEnd; ++c) {
      const double w = fdfCellCentrePosition(c, mGrid.mEast0, mGrid.mEastStep, aIn.mGrid.mEast0, aIn.mGrid.mEastStep);
      SKernelTaps aTaps;
      fdfTaps(aKernel, w, aHalfPixel, aTaps);
      aIn.mColFirst[aLevel][c - aIn.mColBegin] = aTaps.mFirst;
      std::copy(aTaps.mWeight, aTaps.mWeight + aTaps.mCount,
                &aIn.mColWeight[aLevel][static_cast<size_t>(c - aIn.mColBegin) * aPixelTaps]);
    }
  }
  aIn.mRing.assign(static_cast<size_t>(aIn.mSlots) * aIn.mGrid.mPixels, aIn.mNull);
  aIn.mSlotLine.assign(aIn.mSlots, -1);
  aIn.mNullsBefore.assign(static_cast<size_t>(aIn.mSlots) * (aIn.mGrid.mPixels + 1), 0);
  mNulls.push_back(aIn.mNull);
  fdfTraceMessage("Geocoded stack: %s  %d x %d  kernel %s  columns %d..%d\n", theName.c_str(), aIn.mGrid.mLines,
                  aIn.mGrid.mPixels, fdfKernelName(mKernel), aIn.mColBegin, aIn.mColEnd - 1);
  mInputs.push_back(std::move(aInput));
  return true;
}

void CGeocodedImageStack::prepareLine(SInput &theInput, int32_t theLine) {
  theInput.mLine = theLine;
  const double u =
      fdfCellCentrePosition(theLine, mGrid.mNorth0, mGrid.mNorthStep, theInput.mGrid.mNorth0, theInput.mGrid.mNorthStep);
  theInput.mRowInside = u >= -0.5 && u < theInput.mGrid.mLines - 0.5;
  if (!theInput.mRowInside)
    return;
  const double aHalf = fdfHalfFootprint(mWindow, mGrid.mNorthStep, theInput.mGrid.mNorthStep);
  int32_t aLow = theInput.mGrid.mLines;
  int32_t aHigh = -1;
  for (size_t aLevel = 0; aLevel < mChain.size(); ++aLevel) {
    SKernelTaps &aTaps = theInput.mRowTaps[aLevel];
    fdfTaps(mChain[aLevel], u, aHalf, aTaps);
    aLow = std::min(aLow, aTaps.mFirst);
    aHigh = std::max(aHigh, aTaps.mFirst + aTaps.mCount - 1);
  }
  aLow = std::max(aLow, 0);
  aHigh = std::min(aHigh, theInput.mGrid.mLines - 1);
  for (int32_t j = aLow; j <= aHigh; ++j) {
    const int32_t aSlot = j % theInput.mSlots;
    if (theInput.mSlotLine[aSlot] == j)
      continue;
    double *aCells = &theInput.mRing[static_cast<size_t>(aSlot) * theInput.mGrid.mPixels];
    theInput.mFile.getLine(aCells, j);
    theInput.mSlotLine[aSlot] = j;
    int32_t *aBefore = theInput.nullsBefore(j);
    aBefore[0] = 0;
    for (int32_t p = 0; p < theInput.mGrid.mPixels; ++p)
      aBefore[p + 1] = aBefore[p] + (theInput.isNull(aCells[p]) ? 1 : 0);
  }
}

namespace {

// Sum of the weighted cells of a T x T support (theLines: its T lines,
// from column theFirst), or false when a cell holds no data. T known at
// compile time lets the loops unroll; clipping keeps the result within the
// cells' range.
template <int T, typename SInputType>
bool fdfApplyTaps(const SInputType &theInput, const double *const *theLines, const double *theRowWeights,
                  int32_t theFirst, const double *theWeights, bool theClip, double &theValue) {
  double aSum = 0.0;
  double aLow = std::numeric_limits<double>::infinity();
  double aHigh = -aLow;
  for (int a = 0; a < T; ++a) {
    const double *aCells = theLines[a] + theFirst;
    double aPartial = 0.0;
    for (int b = 0; b < T; ++b) {
      const double v = aCells[b];
      if (theInput.isNull(v))
        return false;
      aPartial += theWeights[b] * v;
      if (theClip) {
        aLow = std::min(aLow, v);
        aHigh = std::max(aHigh, v);
      }
    }
    aSum += theRowWeights[a] * aPartial;
  }
  theValue = theClip ? std::min(std::max(aSum, aLow), aHigh) : aSum;
  return true;
}

} // namespace

bool CGeocodedImageStack::applyKernel(const SInput &theInput, int32_t theLevel, int32_t theColumn,
                                      double &theValue) const {
  const SKernelTaps &aRow = theInput.mRowTaps[theLevel];
  const int32_t aStride = theInput.mColStride[theLevel];
  const int32_t aIndex = theColumn - theInput.mColBegin;
  const int32_t aFirst = theInput.mColFirst[theLevel][aIndex];
  if (aRow.mFirst < 0 || aRow.mFirst + aRow.mCount > theInput.mGrid.mLines || aFirst < 0 ||
      aFirst + aStride > theInput.mGrid.mPixels)
    return false;
  const double *aWeights = &theInput.mColWeight[theLevel][static_cast<size_t>(aIndex) * aStride];
  const double *aLines[CTLRX_KERNEL_MAX_TAPS];
  for (int32_t a = 0; a < aRow.mCount; ++a)
    aLines[a] = theInput.line(aRow.mFirst + a);
  switch (aStride) {
  case 2: return fdfApplyTaps<2>(theInput, aLines, aRow.mWeight, aFirst, aWeights, mClip, theValue);
  case 4: return fdfApplyTaps<4>(theInput, aLines, aRow.mWeight, aFirst, aWeights, mClip, theValue);
  case 6: return fdfApplyTaps<6>(theInput, aLines, aRow.mWeight, aFirst, aWeights, mClip, theValue);
  default: return fdfApplyTaps<CTLRX_KERNEL_MAX_TAPS>(theInput, aLines, aRow.mWeight, aFirst, aWeights, mClip, theValue);
  }
}

template <int T>
void CGeocodedImageStack::fillLine(const SInput &theInput, double *theDest) const {
  const SKernelTaps &aRow = theInput.mRowTaps[0];
  const bool aRowInside = aRow.mFirst >= 0 && aRow.mFirst + T <= theInput.mGrid.mLines;
  const double *aLines[T];
  const int32_t *aNulls[T];
  for (int a = 0; a < T; ++a) {
    aLines[a] = aRowInside ? theInput.line(aRow.mFirst + a) : nullptr;
    aNulls[a] = aRowInside ? theInput.nullsBefore(aRow.mFirst + a) : nullptr;
  }
  const int32_t *aFirsts = theInput.mColFirst[0].data();
  const double *aWeights = theInput.mColWeight[0].data();
  const int32_t aLastFirst = theInput.mGrid.mPixels - T;
  for (int32_t c = theInput.mColBegin; c < theInput.mColEnd; ++c) {
    const int32_t aIndex = c - theInput.mColBegin;
    const int32_t aFirst = aFirsts[aIndex];
    const double *aColumnWeights = aWeights + static_cast<size_t>(aIndex) * T;
    // The kernel itself where its support is inside and free of no data
    // (the same sums as fdfApplyTaps, without its tests); the fallbacks
    // otherwise.
    bool aDirect = aRowInside && !mClip && aFirst >= 0 && aFirst <= aLastFirst;
    for (int a = 0; a < T && aDirect; ++a)
      aDirect = aNulls[a][aFirst + T] == aNulls[a][aFirst];
    if (aDirect) {
      double aSum = 0.0;
      for (int a = 0; a < T; ++a) {
        const double *aCells = aLines[a] + aFirst;
        double aPartial = 0.0;
        for (int b = 0; b < T; ++b)
          aPartial += aColumnWeights[b] * aCells[b];
        aSum += aRow.mWeight[a] * aPartial;
      }
      theDest[c] = aSum;
      continue;
    }
    double aValue;
    if (aRowInside && aFirst >= 0 && aFirst <= aLastFirst &&
        fdfApplyTaps<T>(theInput, aLines, aRow.mWeight, aFirst, aColumnWeights, mClip, aValue))
      theDest[c] = aValue;
    else
      theDest[c] = evaluate(theInput, c);
  }
}

double CGeocodedImageStack::applyFootprint(const SInput &theInput, int32_t theColumn) const {
  const SKernelTaps &aRow = theInput.mRowTaps[0];
  const int32_t aStride = theInput.mColStride[0];
  const int32_t aIndex = theColumn - theInput.mColBegin;
  const int32_t aFirst = theInput.mColFirst[0][aIndex];
  const double *aWeights = &theInput.mColWeight[0][static_cast<size_t>(aIndex) * aStride];
  double aSum = 0.0;
  double aWeightSum = 0.0;
  for (int32_t a = 0; a < aRow.mCount; ++a) {
    const int32_t aLine = aRow.mFirst + a;
    if (aRow.mWeight[a] <= 0.0 || aLine < 0 || aLine >= theInput.mGrid.mLines)
      continue;
    const double *aCells = theInput.line(aLine);
    for (int32_t b = 0; b < aStride; ++b) {
      const int32_t aPixel = aFirst + b;
      if (aWeights[b] <= 0.0 || aPixel < 0 || aPixel >= theInput.mGrid.mPixels || theInput.isNull(aCells[aPixel]))
        continue;
      const double w = aRow.mWeight[a] * aWeights[b];
      aSum += w * aCells[aPixel];
      aWeightSum += w;
    }
  }
  return aWeightSum > 0.0 ? aSum / aWeightSum : theInput.mNull;
}

double CGeocodedImageStack::evaluate(const SInput &theInput, int32_t theColumn) const {
  if (!theInput.mRowInside || theColumn < theInput.mColBegin || theColumn >= theInput.mColEnd)
    return theInput.mNull;
  if (fdfIsFootprintKernel(mKernel))
    return applyFootprint(theInput, theColumn);
  const int32_t aLast = static_cast<int32_t>(mChain.size()) - 1;
  double aValue = 0.0;
  for (int32_t aLevel = 0; aLevel < aLast; ++aLevel)
    if (applyKernel(theInput, aLevel, theColumn, aValue))
      return aValue;
  // Nearest neighbour: the cell is inside, so only no data can stop it.
  const SKernelTaps &aRow = theInput.mRowTaps[aLast];
  const double v = theInput.line(aRow.mFirst)[theInput.mColFirst[aLast][theColumn - theInput.mColBegin]];
  return theInput.isNull(v) ? theInput.mNull : v;
}

double CGeocodedImageStack::value(int32_t theInput, int32_t theLine, int32_t thePixel) {
  if (theInput < 0 || theInput >= getInputCount())
    TLRX_RAISE_F(CTLRX_ERR_FILE_PARSE, "geocoded stack input %d of %d", theInput, getInputCount());
  SInput &aIn = *mInputs[theInput];
  if (theLine < 0 || theLine >= mGrid.mLines || thePixel < 0 || thePixel >= mGrid.mPixels)
    return aIn.mNull;
  if (aIn.mLine != theLine)
    prepareLine(aIn, theLine);
  return evaluate(aIn, thePixel);
}

void CGeocodedImageStack::getLine(int32_t theInput, int32_t theLine, double *theDest) {
  if (theInput < 0 || theInput >= getInputCount() || theLine < 0 || theLine >= mGrid.mLines)
    TLRX_RAISE_F(CTLRX_ERR_FILE_PARSE, "geocoded stack input %d line %d", theInput, theLine);
  SInput &aIn = *mInputs[theInput];
  if (aIn.mLine != theLine)
    prepareLine(aIn, theLine);
  std::fill(theDest, theDest + aIn.mColBegin, aIn.mNull);
  if (!aIn.mRowInside || fdfIsFootprintKernel(mKernel) || mChain.size() == 1) {
    for (int32_t c = aIn.mColBegin; c < aIn.mColEnd; ++c)
      theDest[c] = evaluate(aIn, c);
  } else {
    switch (aIn.mColStride[0]) {
    case 2: fillLine<2>(aIn, theDest); break;
    case 4: fillLine<4>(aIn, theDest); break;
    case 6: fillLine<6>(aIn, theDest); break;
    default: fillLine<CTLRX_KERNEL_MAX_TAPS>(aIn, theDest); break;
    }
  }
  std::fill(theDest + std::max(aIn.mColEnd, aIn.mColBegin), theDest + mGrid.mPixels, aIn.mNull);
}
