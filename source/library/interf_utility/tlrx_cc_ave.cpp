// Coherence estimation (see tlrx_cc_ave.h). The inputs are read in bands of
// lines over the processing window and the bands' blocks of lines computed in
// parallel: the plain path on the window rings of tlrx_window_sums.h, the
// local-frequency path directly over the Fa lines of each outer window.
#include "tlrx_cc_ave.h"

#include <algorithm>
#include <cmath>
#include <complex>
#include <string>
#include <vector>

#include "tlrx_coherence_measure.h"
#include "tlrx_description_section.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"
#include "tlrx_no_data.h"
#include "tlrx_raster_file.h"
#include "tlrx_result_files.h"
#include "tlrx_step_common.h"
#include "tlrx_threads.h"
#include "tlrx_window_sums.h"

namespace {

using TCell = std::complex<float>;

// The window limits of the other window steps.
constexpr int32_t CTLRX_CC_MIN_WINDOW = 2;
constexpr int32_t CTLRX_CC_MAX_WINDOW = 500;

struct SCcArguments {
  int32_t mWr = 0, mWa = 0;
  bool mLocal = false;
  int32_t mFr = 0, mFa = 0;
  int32_t mXmin = 0, mXmax = 0, mYmin = 0, mYmax = 0;
};

// One input over the processing window.
struct SCcInput {
  std::string mName;
  CDescription mHeader;
  CRasterFile mRaster;
  SNoData mNull;
};

void openInput(SCcInput &theInput, const char *theName) {
  theInput.mName = theName;
  fdfLoadInputHeader(theInput.mName, theInput.mHeader);
}

int32_t windowToken(const char *theToken, const char *theWhat) {
  return fdfIntegerToken(theToken, theWhat, CTLRX_ERR_ARGUMENTS);
}

void checkWindow(int32_t theRange, int32_t theAzimuth) {
  for (const int32_t aSize : {theRange, theAzimuth})
    if (aSize < CTLRX_CC_MIN_WINDOW || aSize > CTLRX_CC_MAX_WINDOW) {
      fdfTraceMessage("Error: window %d x %d, each side %d .. %d\n", theRange, theAzimuth, CTLRX_CC_MIN_WINDOW,
                      CTLRX_CC_MAX_WINDOW);
      TLRX_RAISE(CTLRX_ERR_ARGUMENTS, nullptr);
    }
}

// Windows and local-frequency switch (arguments 5 to 9).
SCcArguments readWindows(int argc, char **argv) {
  SCcArguments a;
  a.mWr = windowToken(argv[5], "range window");
  a.mWa = argc > 6 ? windowToken(argv[6], "azimuth window") : a.mWr;
  fdfTraceMessage("Window Size Range Coh : %d\nWindow Size Azimuth Coh : %d\n", a.mWr, a.mWa);
  checkWindow(a.mWr, a.mWa);
  if (argc - 1 >= 8) {
    a.mFr = windowToken(argv[7], "range window of the local frequency");
    a.mFa = windowToken(argv[8], "azimuth window of the local frequency");
    fdfTraceMessage("Window Size Range for removel local frequency : %d\n"
                    "Window Size Azimuth for removel local frequency : %d\n",
                    a.mFr, a.mFa);
    a.mLocal = a.mFr > 0 && a.mFa > 0;
  }
  if (a.mLocal && (a.mFr < a.mWr || a.mFa < a.mWa)) {
    const char *aFormat = "\nInsert a Window Size to estimate the Local Frequency: Rg [%d] Az [%d] bigger than "
                          "coherence window size: Rg [%d] Az [%d]";
    fdfTraceMessage(aFormat, a.mFr, a.mFa, a.mWr, a.mWa);
    fdfLogMessage(aFormat, a.mFr, a.mFa, a.mWr, a.mWa);
    a.mFr = std::max(a.mFr, a.mWr);
    a.mFa = std::max(a.mFa, a.mWa);
  }
  fdfTraceMessage("Removel local frequency : %d\n", a.mLocal ? 1 : 0);
  if (a.mLocal) {
    checkWindow(a.mFr, a.mFa);
    if (argc - 1 < 9) {
      fdfTraceMessage("Error: the local frequency removal needs argument 9\n");
      TLRX_RAISE(CTLRX_ERR_ARGUMENTS, nullptr);
    }
    CDescription aAuxiliary;
    fdfLoadInputHeader(argv[9], aAuxiliary);
  }
  return a;
}

// The processing window (arguments 10 to 13), limited to the image.
void readProcessingWindow(int argc, char **argv, int32_t theLines, int32_t thePixels, SCcArguments &a) {
  a.mXmin = argc > 10 ? fdfIntegerToken(argv[10], "xmin", CTLRX_ERR_ARGUMENTS) : 0;
  a.mXmax = argc > 11 ? fdfIntegerToken(argv[11], "xmax", CTLRX_ERR_ARGUMENTS) : thePixels - 1;
  a.mYmin = argc > 12 ? fdfIntegerToken(argv[12], "ymin", CTLRX_ERR_ARGUMENTS) : 0;
  a.mYmax = argc > 13 ? fdfIntegerToken(argv[13], "ymax", CTLRX_ERR_ARGUMENTS) : theLines - 1;
  if (a.mYmax > theLines - 1) {
    a.mYmax = theLines - 1;
    fdfTraceMessage("insufficient #lines in the file, ymax:%d\n", a.mYmax);
  }
  if (a.mXmax > thePixels - 1) {
    a.mXmax = thePixels - 1;
    fdfTraceMessage("insufficient #pixels in the file, xmax:%d\n", a.mXmax);
  }
  fdfTraceMessage("processing window, xmin,xmax,ymin,ymax: %d %d %d %d\n", a.mXmin, a.mXmax, a.mYmin, a.mYmax);
  if (a.mXmin < 0 || a.mYmin < 0 || a.mXmin > a.mXmax || a.mYmin > a.mYmax) {
    fdfTraceMessage("Error: the processing window is empty or outside the image\n");
    TLRX_RAISE_F(CTLRX_ERR_ARGUMENTS, "processing window %d %d %d %d of an image of %d x %d", a.mXmin, a.mXmax,
                 a.mYmin, a.mYmax, theLines, thePixels);
  }
}

bool isAmplitude(const CRasterFile &theRaster) {
  const int32_t aUnits = theRaster.getDataUnits();
  return aUnits == 1 || aUnits == 2; // "AMPLITUDE", "SQUARE ROOT"
}

// Master power name m_pwr gives m_slc: cut at the last "_".
std::string slcName(const std::string &theName) {
  const size_t aCut = theName.find_last_of('_');
  return (aCut == std::string::npos ? theName : theName.substr(0, aCut)) + "_slc";
}

// One input line over the processing window: as read, then prepared in place
// (tlrx_coherence_measure.h), with its unit-phasor differences when the local
// frequency is removed.
struct SCcRow {
  std::vector<TCell> mZ, mRange, mAzimuth;
  std::vector<float> mM, mS, mRangeAngles, mAzimuthAngles;
  std::vector<uint8_t> mZValid, mMValid, mSValid, mInvalid;
};

// The input lines a band needs. Lines the band before held too are kept; the
// others are read on the calling thread, then prepared in parallel, each line
// once (its differences need the line above prepared, so they come after).
class CCcBand {
public:
  CCcBand(SCcInput &theZ, SCcInput &theM, SCcInput &theS, const SCcArguments &theArgs,
          const SCoherenceInputs &theSwitches, bool theDifferences, int32_t theCapacity)
      : mZ(theZ), mM(theM), mS(theS), mArgs(theArgs), mSwitches(theSwitches), mDifferences(theDifferences),
        mPixels(theArgs.mXmax - theArgs.mXmin + 1), mRows(static_cast<size_t>(theCapacity)) {
    const size_t n = static_cast<size_t>(mPixels), aDifferences = theDifferences ? n : 0;
    for (SCcRow &aRow : mRows) {
      aRow.mZ.resize(n);
      aRow.mM.resize(n);
      aRow.mS.resize(n);
      for (auto *aFlags : {&aRow.mZValid, &aRow.mMValid, &aRow.mSValid, &aRow.mInvalid})
        aFlags->resize(n);
      aRow.mRange.resize(aDifferences);
      aRow.mAzimuth.resize(aDifferences);
      aRow.mRangeAngles.resize(aDifferences);
      aRow.mAzimuthAngles.resize(aDifferences);
    }
  }
  int32_t pixels() const { return mPixels; }

  // Line l sits in row l % rows: the lines the band before held stay put.
  void hold(const SLineBand &theBand) {
    const int32_t aHeldFirst = mFirst, aHeldEnd = mFirst + mCount;
    const int32_t aRows = static_cast<int32_t>(mRows.size());
    if (theBand.mInCount > aRows)
      TLRX_RAISE_F(CTLRX_ERR_UNEXPECTED, "coherence band of %d lines, %d rows", theBand.mInCount, aRows);
    mFirst = theBand.mInFirst;
    mCount = 0; // nothing to read from while the band changes (a read may fail)
    std::vector<int32_t> aNew;
    for (int32_t aLine = theBand.mInFirst; aLine < theBand.mInFirst + theBand.mInCount; ++aLine)
      if (aLine < aHeldFirst || aLine >= aHeldEnd) {
        read(aLine, rowOf(aLine));
        aNew.push_back(aLine);
      }
    mCount = theBand.mInCount;
    const int64_t aCount = static_cast<int64_t>(aNew.size());
    fdfParallelFor(aCount, [&](int64_t i, int) { prepare(rowOf(aNew[static_cast<size_t>(i)])); });
    if (!mDifferences)
      return;
    // The first line of a band below line 0 is there only as the line above
    // the next one: no window of the band holds it.
    fdfParallelFor(aCount, [&](int64_t i, int) {
      const int32_t aLine = aNew[static_cast<size_t>(i)];
      if (aLine == mFirst && aLine > 0)
        return;
      SCcRow &aRow = rowOf(aLine);
      const TCell *aAbove = aLine > 0 ? rowOf(aLine - 1).mZ.data() : nullptr;
      fdfPhaseDifferences(aRow.mZ.data(), aAbove, mPixels, aRow.mRange.data(), aRow.mRangeAngles.data(),
                          aRow.mAzimuth.data(), aRow.mAzimuthAngles.data());
    });
  }

  // Window line theLine (0 = ymin) of the band held.
  const SCcRow &row(int32_t theLine) const {
    if (theLine < mFirst || theLine >= mFirst + mCount)
      TLRX_RAISE_F(CTLRX_ERR_UNEXPECTED, "coherence line %d asked of the band of lines %d .. %d", theLine, mFirst,
                   mFirst + mCount - 1);
    return mRows[static_cast<size_t>(theLine) % mRows.size()];
  }

private:
  SCcRow &rowOf(int32_t theLine) { return mRows[static_cast<size_t>(theLine) % mRows.size()]; }

  void read(int32_t theLine, SCcRow &theRow) {
    const int32_t aRow = mArgs.mYmin + theLine;
    mZ.mRaster.getComplexLine(theRow.mZ.data(), aRow, mArgs.mXmin, mArgs.mXmax, theRow.mZValid.data());
    mM.mRaster.getLine(theRow.mM.data(), aRow, mArgs.mXmin, mArgs.mXmax);
    mS.mRaster.getLine(theRow.mS.data(), aRow, mArgs.mXmin, mArgs.mXmax);
  }

  void prepare(SCcRow &theRow) const {
    for (int32_t j = 0; j < mPixels; ++j) {
      theRow.mMValid[static_cast<size_t>(j)] = mM.mNull.isNull(theRow.mM[static_cast<size_t>(j)]) ? 0 : 1;
      theRow.mSValid[static_cast<size_t>(j)] = mS.mNull.isNull(theRow.mS[static_cast<size_t>(j)]) ? 0 : 1;
    }
    fdfCoherencePrepare(theRow.mZ.data(), theRow.mZValid.data(), theRow.mM.data(), theRow.mMValid.data(),
                        theRow.mS.data(), theRow.mSValid.data(), mPixels, mSwitches, theRow.mInvalid.data());
  }

  SCcInput &mZ, &mM, &mS;
  const SCcArguments &mArgs;
  SCoherenceInputs mSwitches;
  bool mDifferences;
  int32_t mPixels;
  std::vector<SCcRow> mRows;
  int32_t mFirst = 0;
  int32_t mCount = 0;
};

// Both paths stream the lines in bands: the calling thread tells progress for
// every line and reads the band, blocks of lines are computed in parallel into
// the band's output, which the calling thread writes in order.
class CCcOutput {
public:
  CCcOutput(CResultRaster &theOut, int32_t theLines, int32_t thePixels, int32_t theBandLines)
      : mOut(theOut), mLines(theLines), mValues(theBandLines, thePixels) {}

  void start(const SLineBand &theBand) {
    for (int32_t l = theBand.mFirst; l < theBand.mFirst + theBand.mCount; ++l)
      mProgress.update(l, mLines);
  }
  float *line(int32_t theLine) { return mValues.line(theLine); }
  void write(const SLineBand &theBand) {
    for (int32_t l = theBand.mFirst; l < theBand.mFirst + theBand.mCount; ++l)
      mOut.file().putLine(l, line(l));
  }

private:
  CResultRaster &mOut;
  int32_t mLines;
  CBandLines<float> mValues;
  CLineProgress mProgress{97.0, 1};
};

// Plain path: running sums through the window rings.
void runPlain(SCcInput &theZ, SCcInput &theM, SCcInput &theS, const SCoherenceInputs &theSwitches,
              int32_t theLineCount, const SCcArguments &theArgs, float theNull, CResultRaster &theOut) {
  const SWindowShape aShape{theArgs.mWa, theArgs.mWr, ETLRXWindowBorder::kNull};
  const int32_t aPixels = theArgs.mXmax - theArgs.mXmin + 1;
  CWindowBands aBands(aShape, theLineCount, aPixels, CTLRX_COHERENCE_CHANNELS, fdfThreadCount(), fdfParallelFor);
  CCcBand aInput(theZ, theM, theS, theArgs, theSwitches, false, aBands.plan().bandInputLines());
  CCcOutput aOutput(theOut, theLineCount, aPixels, aBands.plan().mBand);
  aBands.run(
      [&](const SLineBand &theBand) {
        aOutput.start(theBand);
        aInput.hold(theBand);
      },
      [&](CWindowRing &theRing, int32_t theLine, int) {
        const SCcRow &aRow = aInput.row(theLine);
        fdfCoherenceTerms(aRow.mZ.data(), aRow.mM.data(), aRow.mS.data(), aRow.mInvalid.data(), aPixels,
                          theRing.termArrays().data(), theRing.centre(theLine));
      },
      [&](CWindowRing &theRing, int32_t theLine, int) {
        fdfCoherenceLine(theRing.columnArrays().data(), theRing.centre(theLine), aPixels, theNull,
                         aOutput.line(theLine));
      },
      [&](const SLineBand &theBand) { aOutput.write(theBand); });
}

// Lines of a block of the local-frequency path: its pixels are independent,
// so the block length only sets the grain of the work.
constexpr int32_t CTLRX_CC_LOCAL_BLOCK = 16;

// Local-frequency path: the Fa lines of the outer window (and the line above
// it, for the azimuth differences), and direct sums of z e^(-i psi) over the
// central window.
class CLocalPath {
public:
  CLocalPath(SCcInput &theZ, SCcInput &theM, SCcInput &theS, const SCoherenceInputs &theSwitches,
             int32_t theLineCount, const SCcArguments &theArgs, float theNull)
      : mLineCount(theLineCount), mArgs(theArgs), mNull(theNull), mPixels(theArgs.mXmax - theArgs.mXmin + 1),
        mPlan(fdfBandPlan(theLineCount, CTLRX_CC_LOCAL_BLOCK, fdfThreadCount(), fdfThreadCount() > 1 ? 2 : 1,
                          theArgs.mFa / 2 + 1, theArgs.mFa - 1 - theArgs.mFa / 2)),
        mInput(theZ, theM, theS, theArgs, theSwitches, true, mPlan.bandInputLines()),
        mScratch(static_cast<size_t>(fdfThreadCount())) {}

  void run(CResultRaster &theOut) {
    CCcOutput aOutput(theOut, mLineCount, mPixels, mPlan.mBand);
    fdfRunBands(
        mPlan, fdfParallelFor,
        [&](const SLineBand &theBand) {
          aOutput.start(theBand);
          mInput.hold(theBand);
        },
        [&](int32_t theFirst, int32_t theCount, int theThread) {
          for (int32_t l = theFirst; l < theFirst + theCount; ++l)
            line(l, mScratch.at(static_cast<size_t>(theThread)), aOutput.line(l));
        },
        [&](const SLineBand &theBand) { aOutput.write(theBand); });
  }

private:
  // The line arrays of one pixel's outer window, per thread.
  struct SScratch {
    std::vector<const TCell *> mRangeDiffs, mAzimuthDiffs;
    std::vector<const float *> mRangeAngles, mAzimuthAngles;
  };

  void line(int32_t theLine, SScratch &theScratch, float *theOut) const {
    const int32_t aLeft = mArgs.mFr / 2;
    const int32_t aOffsetLines = (mArgs.mFa - mArgs.mWa) / 2, aOffsetColumns = (mArgs.mFr - mArgs.mWr) / 2;
    const int32_t aFirst = theLine - mArgs.mFa / 2, aLast = aFirst + mArgs.mFa - 1;
    std::fill(theOut, theOut + mPixels, mNull);
    if (aFirst < 0 || aLast >= mLineCount)
      return;
    theScratch.mRangeDiffs.clear();
    theScratch.mAzimuthDiffs.clear();
    theScratch.mRangeAngles.clear();
    theScratch.mAzimuthAngles.clear();
    for (int32_t k = 0; k < mArgs.mFa; ++k) {
      const SCcRow &aRow = mInput.row(aFirst + k);
      theScratch.mRangeDiffs.push_back(aRow.mRange.data());
      theScratch.mAzimuthDiffs.push_back(aRow.mAzimuth.data());
      theScratch.mRangeAngles.push_back(aRow.mRangeAngles.data());
      theScratch.mAzimuthAngles.push_back(aRow.mAzimuthAngles.data());
    }
    for (int32_t j = aLeft; j - aLeft + mArgs.mFr - 1 < mPixels; ++j)
      theOut[j] = pixel(theScratch, aFirst, j - aLeft, aOffsetLines, aOffsetColumns);
  }

  // The coherence of the pixel whose outer window starts at line theLine,
  // column theColumn.
  float pixel(const SScratch &theScratch, int32_t theLine, int32_t theColumn, int32_t theOffsetLines,
              int32_t theOffsetColumns) const {
    double aFr = 0.0, aFa = 0.0;
    if (!fdfLocalFrequency({theScratch.mRangeDiffs.data(), theScratch.mRangeAngles.data()},
                           {theScratch.mAzimuthDiffs.data(), theScratch.mAzimuthAngles.data()}, theColumn, mArgs.mFr,
                           mArgs.mFa, aFr, aFa))
      return mNull;
    double aM = 0.0, aS = 0.0, aRe = 0.0, aIm = 0.0;
    const std::complex<double> aStep = std::polar(1.0, -aFr);
    for (int32_t k = 0; k < mArgs.mWa; ++k) {
      const SCcRow &aRow = mInput.row(theLine + theOffsetLines + k);
      // psi starts at k fa on window line k and grows by fr before each column.
      std::complex<double> aTurn = std::polar(1.0, -k * aFa);
      for (int32_t c = theColumn + theOffsetColumns; c < theColumn + theOffsetColumns + mArgs.mWr; ++c) {
        if (aRow.mInvalid[static_cast<size_t>(c)] != 0)
          return mNull;
        aTurn *= aStep;
        const std::complex<double> z = std::complex<double>(aRow.mZ[static_cast<size_t>(c)]) * aTurn;
        aRe += z.real();
        aIm += z.imag();
        aM += aRow.mM[static_cast<size_t>(c)];
        aS += aRow.mS[static_cast<size_t>(c)];
      }
    }
    return fdfCoherenceValue(aM, aS, aRe, aIm, mNull);
  }

  int32_t mLineCount;
  const SCcArguments &mArgs;
  float mNull;
  int32_t mPixels;
  SBandPlan mPlan;
  CCcBand mInput;
  std::vector<SScratch> mScratch;
};

} // namespace

int tlrx_cc_ave(int argc, char **argv) {
  fdfTraceMessage("*** correlation estimation from normalized interferogram v5.3 21-apr-99 ***\n");
  fdfTraceMessage("*** correlation estimation from normalized interferogram v5.4 08-sep-09 ***\n");
  if (argc - 1 < 4) {
    fdfTraceMessage("Usage: %s <interferogram> <master power> <slave power> <output> <Wr> [Wa [Fr Fa aux [xmin xmax "
                    "ymin ymax]]]\n",
                    argc > 0 ? argv[0] : "tlrx_cc_ave");
    TLRX_RAISE(CTLRX_ERR_ARGUMENTS, nullptr);
  }
  fdfTraceMessage("CC_AVE input interf : %s\n", argv[1]);
  CRunFiles aFiles;
  for (int i = 1; i <= 3; ++i)
    aFiles.addInput(argv[i]);
  aFiles.addResult(argv[4], false);
  aFiles.refuseClashes(CTLRX_ERR_PARAMETER_FILE);
  SCcInput aZ, aM, aS;
  openInput(aZ, argv[1]);
  openInput(aM, argv[2]);
  openInput(aS, argv[3]);
  for (SCcInput *aInput : {&aZ, &aM, &aS}) {
    aInput->mRaster.open_read(aInput->mName.c_str(), aInput->mHeader);
    aInput->mNull = aInput->mRaster.getNoData();
  }
  SCoherenceInputs aSwitches;
  std::string aOrigin;
  aSwitches.mWideSwath = fdfFindOtherInfo(aM.mHeader, "ORIGIN DATA", aOrigin) &&
                         (aOrigin == "ENVISAT_WS_SR" || aOrigin == "ENVISAT_WS_GR");
  if (aSwitches.mWideSwath)
    fdfTraceMessage("aWsIntFlag = %d\n", 1);
  aSwitches.mMasterAmplitude = isAmplitude(aM.mRaster);
  aSwitches.mSlaveAmplitude = isAmplitude(aS.mRaster);
  fdfTraceMessage("master DUID = %d\nslave DUID = %d\n", aM.mRaster.getDataUnits(), aS.mRaster.getDataUnits());
  if (aSwitches.mMasterAmplitude)
    fdfTraceMessage("master AMPLITUDE\n");
  if (aSwitches.mSlaveAmplitude)
    fdfTraceMessage("slave AMPLITUDE\n");
  if (argc - 1 < 5) {
    fdfTraceMessage("Error: the range window (argument 5) is missing\n");
    TLRX_RAISE(CTLRX_ERR_ARGUMENTS, nullptr);
  }
  SCcArguments aArgs = readWindows(argc, argv);
  const int32_t aLines = aZ.mRaster.getNrOfLinesPerImage(), aPixels = aZ.mRaster.getNrOfPixelsPerLine();
  for (const SCcInput *aInput : {&aM, &aS})
    if (aInput->mRaster.getNrOfLinesPerImage() != aLines || aInput->mRaster.getNrOfPixelsPerLine() != aPixels) {
      fdfTraceMessage("Error: %s is not the size of the interferogram (%d x %d)\n", aInput->mName.c_str(), aLines,
                      aPixels);
      TLRX_RAISE_F(CTLRX_ERR_SIZE_MISMATCH, "%.200s: %d x %d, the interferogram %d x %d", aInput->mName.c_str(),
                   aInput->mRaster.getNrOfLinesPerImage(), aInput->mRaster.getNrOfPixelsPerLine(), aLines, aPixels);
    }
  readProcessingWindow(argc, argv, aLines, aPixels, aArgs);
  const int32_t aOutLines = aArgs.mYmax - aArgs.mYmin + 1, aOutPixels = aArgs.mXmax - aArgs.mXmin + 1;

  const float aNull = fdfGetDummyValue();
  CDescription aHeader;
  fdfMakeResultHeader(aHeader, aZ.mHeader, "FLOAT", "COHERENCE", fdfGetDummyValueDouble());
  fdfSetHeaderNumber(aHeader, "RasterInfo.NrOfLinesPerImage", aOutLines);
  fdfSetHeaderNumber(aHeader, "RasterInfo.NrOfPixelsPerLine", aOutPixels);
  fdfSetHeaderList(aHeader, "RasterInfo.FilesList", {slcName(aM.mName), slcName(aS.mName)});
  CResultRaster aOut(argv[4], aHeader);
  if (aArgs.mLocal)
    CLocalPath(aZ, aM, aS, aSwitches, aOutLines, aArgs, aNull).run(aOut);
  else
    runPlain(aZ, aM, aS, aSwitches, aOutLines, aArgs, aNull, aOut);
  for (SCcInput *aInput : {&aZ, &aM, &aS})
    aInput->mRaster.close();
  fdfTraceMessage("\noutput lines:%d\n", aOutLines);
  fdfTraceMessage("writing new parameters to parameter file\n");
  aOut.commit(aHeader, CTLRX_ERR_FILE_COPY);
  return 0;
}

int tlrx_cc_ave_close(int argc, char **argv) {
  if (argc - 1 < 4) {
    fdfTraceMessage("\nSHUT: %d arguments, 4 wanted: nothing removed\n", argc - 1);
    return 0;
  }
  fdfTraceMessage("\nSHUT\n");
  for (int i = 1; i <= 3; ++i)
    fdfDeleteRaster(argv[i], true, true);
  return 0;
}
