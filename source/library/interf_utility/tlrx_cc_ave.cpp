// Coherence estimation (see tlrx_cc_ave.h). The inputs are read line by line
// over the processing window; the plain path streams through the window ring
// of tlrx_window_sums.h, the local-frequency path keeps the Fa lines of its
// outer window.
#include "tlrx_cc_ave.h"

#include <algorithm>
#include <cmath>
#include <complex>
#include <deque>
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

// One input over the processing window: a line of cells or values and the
// raster's validity flags.
struct SCcInput {
  std::string mName;
  CDescription mHeader;
  CRasterFile mRaster;
  SNoData mNull;
  std::vector<uint8_t> mValid;
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

// The three inputs over the processing window, one prepared line at a time.
class CCcLines {
public:
  CCcLines(SCcInput &theZ, SCcInput &theM, SCcInput &theS, const SCcArguments &theArgs,
           const SCoherenceInputs &theSwitches)
      : mZ(theZ), mM(theM), mS(theS), mArgs(theArgs), mSwitches(theSwitches),
        mPixels(theArgs.mXmax - theArgs.mXmin + 1) {
    for (SCcInput *aInput : {&mZ, &mM, &mS})
      aInput->mValid.resize(static_cast<size_t>(mPixels));
  }
  int32_t pixels() const { return mPixels; }

  // Window line theLine (0 = ymin), prepared into the given buffers.
  void read(int32_t theLine, TCell *theZ, float *theM, float *theS, uint8_t *theInvalid) {
    const int32_t aRow = mArgs.mYmin + theLine;
    mZ.mRaster.getComplexLine(theZ, aRow, mArgs.mXmin, mArgs.mXmax, mZ.mValid.data());
    mM.mRaster.getLine(theM, aRow, mArgs.mXmin, mArgs.mXmax);
    mS.mRaster.getLine(theS, aRow, mArgs.mXmin, mArgs.mXmax);
    for (int32_t j = 0; j < mPixels; ++j) {
      mM.mValid[j] = mM.mNull.isNull(theM[j]) ? 0 : 1;
      mS.mValid[j] = mS.mNull.isNull(theS[j]) ? 0 : 1;
    }
    fdfCoherencePrepare(theZ, mZ.mValid.data(), theM, mM.mValid.data(), theS, mS.mValid.data(), mPixels, mSwitches,
                        theInvalid);
  }

private:
  SCcInput &mZ, &mM, &mS;
  const SCcArguments &mArgs;
  SCoherenceInputs mSwitches;
  int32_t mPixels;
};

// Plain path: running sums through the window ring.
void runPlain(CCcLines &theLines, int32_t theLineCount, const SCcArguments &theArgs, float theNull,
              CResultRaster &theOut) {
  const SWindowShape aShape{theArgs.mWa, theArgs.mWr, ETLRXWindowBorder::kNull};
  const int32_t aPixels = theLines.pixels();
  CWindowRing aRing(aShape, theLineCount, aPixels, CTLRX_COHERENCE_CHANNELS);
  const std::vector<double *> aTerms = aRing.termArrays();
  const std::vector<const double *> aSums = aRing.columnArrays();
  std::vector<TCell> aZ(static_cast<size_t>(aPixels));
  std::vector<float> aM(static_cast<size_t>(aPixels)), aS(static_cast<size_t>(aPixels)),
      aOut(static_cast<size_t>(aPixels));
  std::vector<uint8_t> aInvalid(static_cast<size_t>(aPixels));
  CLineProgress aProgress(97.0, 1);
  fdfRunWindowSchedule(
      aRing,
      [&](int32_t theLine) {
        theLines.read(theLine, aZ.data(), aM.data(), aS.data(), aInvalid.data());
        fdfCoherenceTerms(aZ.data(), aM.data(), aS.data(), aInvalid.data(), aPixels, aTerms.data(),
                          aRing.centre(theLine));
      },
      [&](int32_t theLine) {
        fdfCoherenceLine(aSums.data(), aRing.centre(theLine), aPixels, theNull, aOut.data());
        theOut.file().putLine(theLine, aOut.data());
      },
      [&](int32_t theLine, int32_t theCount) { aProgress.update(theLine, theCount); });
}

// Local-frequency path: the Fa lines of the outer window, their unit-phasor
// differences, and direct sums of z e^(-i psi) over the central window.
class CLocalPath {
public:
  CLocalPath(CCcLines &theLines, int32_t theLineCount, const SCcArguments &theArgs, float theNull)
      : mLines(theLines), mLineCount(theLineCount), mArgs(theArgs), mNull(theNull), mPixels(theLines.pixels()) {}

  void run(CResultRaster &theOut) {
    const int32_t aAbove = mArgs.mFa / 2, aLeft = mArgs.mFr / 2;
    const int32_t aOffsetLines = (mArgs.mFa - mArgs.mWa) / 2, aOffsetColumns = (mArgs.mFr - mArgs.mWr) / 2;
    std::vector<float> aOut(static_cast<size_t>(mPixels));
    CLineProgress aProgress(97.0, 1);
    int32_t aNext = 0;
    for (int32_t l = 0; l < mLineCount; ++l) {
      aProgress.update(l, mLineCount);
      const int32_t aFirst = l - aAbove, aLast = aFirst + mArgs.mFa - 1;
      std::fill(aOut.begin(), aOut.end(), mNull);
      if (aFirst >= 0 && aLast < mLineCount) {
        for (; aNext <= aLast; ++aNext)
          enter(aNext);
        for (int32_t j = aLeft; j - aLeft + mArgs.mFr - 1 < mPixels; ++j)
          aOut[static_cast<size_t>(j)] = pixel(aFirst, j - aLeft, aOffsetLines, aOffsetColumns);
      }
      theOut.file().putLine(l, aOut.data());
    }
  }

private:
  struct SLine {
    std::vector<TCell> mZ, mRange, mAzimuth;
    std::vector<float> mM, mS, mRangeAngles, mAzimuthAngles;
    std::vector<uint8_t> mInvalid;
  };

  void enter(int32_t theLine) {
    SLine aLine;
    if (static_cast<int32_t>(mRing.size()) == mArgs.mFa) {
      aLine = std::move(mRing.front());
      mRing.pop_front();
      ++mFirst;
    }
    const size_t n = static_cast<size_t>(mPixels);
    for (auto *aCells : {&aLine.mZ, &aLine.mRange, &aLine.mAzimuth})
      aCells->resize(n);
    for (auto *aValues : {&aLine.mM, &aLine.mS, &aLine.mRangeAngles, &aLine.mAzimuthAngles})
      aValues->resize(n);
    aLine.mInvalid.resize(n);
    mLines.read(theLine, aLine.mZ.data(), aLine.mM.data(), aLine.mS.data(), aLine.mInvalid.data());
    const TCell *aPrevious = theLine > 0 ? mPrevious.data() : nullptr;
    fdfPhaseDifferences(aLine.mZ.data(), aPrevious, mPixels, aLine.mRange.data(), aLine.mRangeAngles.data(),
                        aLine.mAzimuth.data(), aLine.mAzimuthAngles.data());
    mPrevious = aLine.mZ;
    if (mRing.empty())
      mFirst = theLine;
    mRing.push_back(std::move(aLine));
  }

  // The coherence of the pixel whose outer window starts at line theLine,
  // column theColumn.
  float pixel(int32_t theLine, int32_t theColumn, int32_t theOffsetLines, int32_t theOffsetColumns) {
    mRangeDiffs.clear();
    mAzimuthDiffs.clear();
    mRangeAngles.clear();
    mAzimuthAngles.clear();
    for (int32_t k = 0; k < mArgs.mFa; ++k) {
      const SLine &aLine = mRing[static_cast<size_t>(theLine + k - mFirst)];
      mRangeDiffs.push_back(aLine.mRange.data());
      mAzimuthDiffs.push_back(aLine.mAzimuth.data());
      mRangeAngles.push_back(aLine.mRangeAngles.data());
      mAzimuthAngles.push_back(aLine.mAzimuthAngles.data());
    }
    double aFr = 0.0, aFa = 0.0;
    if (!fdfLocalFrequency({mRangeDiffs.data(), mRangeAngles.data()}, {mAzimuthDiffs.data(), mAzimuthAngles.data()},
                           theColumn, mArgs.mFr, mArgs.mFa, aFr, aFa))
      return mNull;
    double aM = 0.0, aS = 0.0, aRe = 0.0, aIm = 0.0;
    const std::complex<double> aStep = std::polar(1.0, -aFr);
    for (int32_t k = 0; k < mArgs.mWa; ++k) {
      const SLine &aLine = mRing[static_cast<size_t>(theLine + theOffsetLines + k - mFirst)];
      // psi starts at k fa on window line k and grows by fr before each column.
      std::complex<double> aTurn = std::polar(1.0, -k * aFa);
      for (int32_t c = theColumn + theOffsetColumns; c < theColumn + theOffsetColumns + mArgs.mWr; ++c) {
        if (aLine.mInvalid[static_cast<size_t>(c)] != 0)
          return mNull;
        aTurn *= aStep;
        const std::complex<double> z = std::complex<double>(aLine.mZ[static_cast<size_t>(c)]) * aTurn;
        aRe += z.real();
        aIm += z.imag();
        aM += aLine.mM[static_cast<size_t>(c)];
        aS += aLine.mS[static_cast<size_t>(c)];
      }
    }
    return fdfCoherenceValue(aM, aS, aRe, aIm, mNull);
  }

  CCcLines &mLines;
  int32_t mLineCount;
  const SCcArguments &mArgs;
  float mNull;
  int32_t mPixels;
  std::deque<SLine> mRing;
  int32_t mFirst = 0;
  std::vector<TCell> mPrevious;
  std::vector<const TCell *> mRangeDiffs, mAzimuthDiffs;
  std::vector<const float *> mRangeAngles, mAzimuthAngles;
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
  CCcLines aInputLines(aZ, aM, aS, aArgs, aSwitches);
  if (aArgs.mLocal)
    CLocalPath(aInputLines, aOutLines, aArgs, aNull).run(aOut);
  else
    runPlain(aInputLines, aOutLines, aArgs, aNull, aOut);
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
