#include "tlrx_window_step.h"

#include "tlrx_cell_types.h"
#include "tlrx_description_xml.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_header_numbers.h"
#include "tlrx_step_common.h"
#include "tlrx_result_files.h"
#include "tlrx_standard_header.h"
#include "tlrx_threads.h"

#include <algorithm>


namespace {

bool fdfIsComplexHeader(const CDescription &theHeader) {
  return fdfIsComplexCellType(fdfCellTypeFromName(fdfHeaderText(theHeader, "RasterInfo.CellType").c_str()));
}

} // namespace

void fdfCheckWindowSize(int32_t theRows, int32_t theCols, const SWindowRule &theRule) {
  for (int32_t aSize : {theRows, theCols})
    if (aSize < theRule.mMinSize || aSize > theRule.mMaxSize)
      TLRX_RAISE(theRule.mSizeCode, nullptr);
}

bool fdfDeliversIntensity(const CDescription &theHeader) {
  return fdfHeaderText(theHeader, "RasterInfo.DataUnits") == "POWER" || fdfIsComplexHeader(theHeader);
}

CWindowInput::CWindowInput(const char *theName) : mName(theName) {
  fdfLoadInputHeader(mName, mHeader);
  mLines = fdfHeaderInteger(mHeader, "RasterInfo.NrOfLinesPerImage");
  mPixels = fdfHeaderInteger(mHeader, "RasterInfo.NrOfPixelsPerLine");
  mIntensity = fdfDeliversIntensity(mHeader);
}

void CWindowInput::open() {
  // The raster file checks the layout and the file size before anything is
  // sized by the header's counts.
  mRaster.open_read(mName.c_str(), mHeader);
  mRows = mBandFirst = mBandCount = 0;
  mValid.assign(static_cast<size_t>(mPixels), 0);
}

void CWindowInput::readParts() { mParts = fdfIsComplexHeader(mHeader); }

void CWindowInput::reserveLines(int32_t theLines) {
  const size_t aCells = static_cast<size_t>(std::max(0, theLines)) * static_cast<size_t>(mPixels);
  if (mParts)
    mCells.resize(aCells);
  else
    mValues.resize(aCells);
  mMask.resize(aCells);
  mRows = std::max(0, theLines);
  mBandCount = 0;
}

size_t CWindowInput::row(int32_t theLine) const {
  if (theLine < mBandFirst || theLine >= mBandFirst + mBandCount)
    TLRX_RAISE_F(CTLRX_ERR_UNEXPECTED, "%.200s: line %d asked of the band of lines %d .. %d", mName.c_str(), theLine,
                 mBandFirst, mBandFirst + mBandCount - 1);
  return static_cast<size_t>(theLine % mRows) * static_cast<size_t>(mPixels);
}

// The mask is the raster rule's; the window measures then drop a NaN (or
// infinite) value as no data too, whatever the null (tlrx_window_measures.h).
void CWindowInput::readRow(int32_t theLine, size_t theRow) {
  const size_t aOffset = theRow * static_cast<size_t>(mPixels);
  if (!mParts) {
    mRaster.getValidMask(&mValues[aOffset], &mMask[aOffset], theLine);
    return;
  }
  mRaster.getComplexLine(&mCells[aOffset], theLine, 0, -1, mValid.data());
  std::copy(mValid.begin(), mValid.end(), mMask.begin() + static_cast<std::ptrdiff_t>(aOffset));
}

// The rows of the lines of the new band are distinct (no more lines than
// rows), so reading the lines the old band lacks leaves the others in place.
void CWindowInput::readBand(int32_t theFirst, int32_t theCount) {
  if (theCount > mRows)
    reserveLines(theCount);
  const int32_t aHeldFirst = mBandFirst, aHeldEnd = mBandFirst + mBandCount;
  mBandFirst = theFirst;
  mBandCount = 0; // nothing to read from while the band changes (a read may fail)
  for (int32_t aLine = theFirst; aLine < theFirst + theCount; ++aLine)
    if (aLine < aHeldFirst || aLine >= aHeldEnd)
      readRow(aLine, static_cast<size_t>(aLine % mRows));
  mBandCount = theCount;
}

void fdfCheckSameSize(const CWindowInput &theFirst, const CWindowInput &theOther) {
  if (theOther.lines() != theFirst.lines()) {
    fdfTraceMessage("Error: The number of lines does not match (%d , %d)\n", theFirst.lines(), theOther.lines());
    TLRX_RAISE(CTLRX_ERR_SIZE_MISMATCH, nullptr);
  }
  if (theOther.pixels() != theFirst.pixels()) {
    fdfTraceMessage("Error: The number of pixels per line does not match (%d , %d)\n", theFirst.pixels(),
                    theOther.pixels());
    TLRX_RAISE(CTLRX_ERR_SIZE_MISMATCH, nullptr);
  }
}

void fdfMakeWindowResultHeader(CDescription &theResult, const CDescription &theInput, double theNull,
                               const char *theUnits) {
  fdfMakeResultHeader(theResult, theInput, "FLOAT", theUnits, theNull);
}

void fdfStampPairInputs(CDescription &theResult, const CWindowInput &theFirst, const CWindowInput &theSecond) {
  fdfStampPairHeaders(theResult, theFirst.name(), theFirst.header(), theSecond.name(), theSecond.header());
}

void fdfTraceSignificantCount(double theNull, int64_t theCount) {
  fdfTraceMessage("Number of significant value (no equal to %g one) = %lld\n", theNull,
                  static_cast<long long>(theCount));
}

void fdfTracePairStepUsage(int theArgc, char **theArgv, bool theWithNorm) {
  fdfTraceMessage("Parameters Number = %d\n", theArgc);
  for (int i = 0; i < theArgc; ++i)
    fdfTraceMessage(" argv[%d] = %s\n", i, theArgv[i]);
  fdfTraceMessage("Usage: %s <input> <output> <int_par> [ref_image]\n"
                  "  input\t1\t\t  input image 1 file name\n"
                  "  input\t2\t\t  input image 2 file name\n"
                  "%s"
                  "  output  \t\t  output image file name, float\n"
                  "  dummy           dummy value \n"
                  "  row             rows number in texture window \n"
                  "  col             cols number in texture window \n",
                  theArgc > 0 ? theArgv[0] : "", theWithNorm ? "  input\tnorm      input normalized file name\n" : "");
}

CWindowStep::CWindowStep(int theArgc, char **theArgv, const SWindowStepSyntax &theSyntax)
    : mArgc(theArgc), mArgv(theArgv), mRule(theSyntax.mRule) {
  fdfTraceMessage("%s", theSyntax.mBanner);
  if (theArgc < theSyntax.mArguments + 1) {
    theSyntax.mUsage(theArgc, theArgv);
    TLRX_RAISE(theSyntax.mMissingCode, nullptr);
  }
}

int32_t CWindowStep::windowArgument(int theIndex, const char *theWhat) const {
  return fdfIntegerToken(mArgv[theIndex], theWhat, mRule.mSizeCode);
}

double CWindowStep::realArgument(int theIndex, const char *theWhat, int32_t theCode) const {
  return fdfRealToken(mArgv[theIndex], theWhat, theCode);
}

void CWindowStep::setWindow(int32_t theRows, int32_t theCols) {
  fdfCheckWindowSize(theRows, theCols, mRule);
  mShape = SWindowShape{theRows, theCols, mRule.mBorder};
}

void CWindowStep::addInputs(std::initializer_list<int> theIndices) {
  for (int aIndex : theIndices)
    mInputs.push_back(std::make_unique<CWindowInput>(mArgv[aIndex]));
  for (size_t i = 1; i < mInputs.size(); ++i)
    fdfCheckSameSize(*mInputs[0], *mInputs[i]);
}

void CWindowStep::openInputs() {
  for (const auto &aInput : mInputs)
    aInput->open();
}

int CWindowStep::threads() const { return fdfThreadCount(); }

void CWindowStep::runLines(CResultRaster &theOutput, int theChannels, const TLRXWindowTerms &theTerms,
                           const TLRXWindowValues &theValues) {
  CWindowInput &aFirst = *mInputs[0];
  const int32_t aLines = aFirst.lines();
  CWindowBands aBands(mShape, aLines, aFirst.pixels(), theChannels, threads(), fdfParallelFor);
  CBandLines<float> aOut(aBands.plan().mBand, aFirst.pixels());
  for (const auto &aInput : mInputs)
    aInput->reserveLines(aBands.plan().bandInputLines());
  CLineProgress aProgress(97.0, 2);
  aBands.run(
      [&](const SLineBand &theBand) {
        for (int32_t l = theBand.mFirst; l < theBand.mFirst + theBand.mCount; ++l)
          aProgress.update(l, aLines);
        for (const auto &aInput : mInputs)
          aInput->readBand(theBand.mInFirst, theBand.mInCount);
      },
      [&](CWindowRing &theRing, int32_t theLine, int) {
        theTerms(theLine, theRing.termArrays().data(), theRing.centre(theLine));
      },
      [&](CWindowRing &theRing, int32_t theLine, int theThread) {
        theValues(theThread, theRing.columnArrays().data(), theRing.centre(theLine), aOut.line(theLine));
      },
      [&](const SLineBand &theBand) {
        for (int32_t l = theBand.mFirst; l < theBand.mFirst + theBand.mCount; ++l)
          theOutput.file().putLine(l, aOut.line(l));
      });
  for (const auto &aInput : mInputs)
    aInput->close();
}

void CWindowStep::commit(CResultRaster &theOutput, CDescription &theHeader) {
  fdfTraceMessage("writing the output parameter file %s\n", theOutput.name().c_str());
  theOutput.commit(theHeader, CTLRX_ERR_FILE_COPY);
}
