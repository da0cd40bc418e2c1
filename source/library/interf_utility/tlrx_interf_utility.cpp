// Co-registration procedure (see tlrx_interf_utility.h). Windows are read
// from the files line band by line band (CLineBand): only the lines the
// windows of one grid row need are held, never the whole image.
#include "tlrx_interf_utility.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <complex>
#include <cstdio>
#include <map>
#include <memory>
#include <string>

#include "tlrx_cross_corr.h"
#include "tlrx_description_section.h"
#include "tlrx_description_xml.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"
#include "tlrx_platform.h"
#include "tlrx_raster_file.h"
#include "tlrx_standard_header.h"

namespace {

// Below this many lines or pixels a second-order polynomial is not trusted.
constexpr int32_t CTLRX_COREG_MIN_SIZE_QUADRATIC = 600;
constexpr int32_t CTLRX_COREG_MAX_COEFFS = 6;
// The central window never grows beyond this many lines or pixels.
constexpr int32_t CTLRX_COREG_MAX_INIT_WINDOW = 2048;

// ------------------------------------------------------------ parameters

struct SCoregParameters {
  double mStartRange = 0, mStartAzimuth = 0;
  bool mInitOrbits = false, mInitAmplitude = false, mInitCoherence = false;
  int32_t mCoeffRange = 0, mCoeffAzimuth = 0, mResCoeffRange = 0, mResCoeffAzimuth = 0;
  int32_t mBorderRange = 0, mBorderAzimuth = 0;
  double mMultipleRange = 0, mMultipleAzimuth = 0;
  bool mMaximizeVariance = false;
  double mVarianceThreshold = 0;
  int32_t mOrbitInterpolation = 0;
  std::string mShapeFile;
  bool mOrbitTest = false;
  int32_t mRangeWinTest = 0, mAzimuthWinTest = 0;
  double mMaxShiftTest = 0, mValidityTest = 0;
  int32_t mInitRangeWin = 0, mInitAzimuthWin = 0, mInitRangePos = 0, mInitAzimuthPos = 0;
  int32_t mRangeNumberCc = 0, mAzimuthNumberCc = 0, mRangeWinCc = 0, mAzimuthWinCc = 0, mOversamplingCc = 0;
  double mValidityCc = 0;
  int32_t mOversamplingFine = 0, mRangeNumberFine = 0, mAzimuthNumberFine = 0, mRangeWinFine = 0,
          mAzimuthWinFine = 0;
  double mSnrThreshold = 0;
  int32_t mOversamplingCoherence = 0;
  double mCohReject = 0; // 0 (reject nothing) when the file lacks it
};

using P = SCoregParameters;

// One key of "COREGISTRATION_CMD", its log line and where it goes (one of
// the four members is set).
struct SCoregKey {
  const char *mKey;
  const char *mLog;
  double P::*mDouble;
  int32_t P::*mInteger;
  bool P::*mFlag;
  std::string P::*mText;
};
constexpr SCoregKey D(const char *k, const char *l, double P::*m) { return {k, l, m, nullptr, nullptr, nullptr}; }
constexpr SCoregKey I(const char *k, const char *l, int32_t P::*m) { return {k, l, nullptr, m, nullptr, nullptr}; }
constexpr SCoregKey F(const char *k, const char *l, bool P::*m) { return {k, l, nullptr, nullptr, m, nullptr}; }
constexpr SCoregKey S(const char *k, const char *l, std::string P::*m) { return {k, l, nullptr, nullptr, nullptr, m}; }

const SCoregKey sCoregKeys[] = {
    D("cc_start_shift_range", "\ncc_start_shift_range: [%lf]", &P::mStartRange),
    D("cc_start_shift_azimuth", "\ncc_start_shift_azimuth: [%lf]", &P::mStartAzimuth),
    F("cc_init_from_orbits_flag", "\ncc_init_from_orbits_flag: [%s]", &P::mInitOrbits),
    F("cc_init_from_amplitude_flag", "\ncc_init_from_amplitude_flag: [%s]", &P::mInitAmplitude),
    F("cc_init_from_coherence_flag", "\ncc_init_from_coherence_flag: [%s]", &P::mInitCoherence),
    I("cc_number_coeff_range", "\ncc_number_coeff_range: [%d]", &P::mCoeffRange),
    I("cc_number_coeff_azimuth", "\ncc_number_coeff_azimuth: [%d]", &P::mCoeffAzimuth),
    I("cc_number_res_coeff_range", "\ncc_number_res_coeff_range: [%d]", &P::mResCoeffRange),
    I("cc_number_res_coeff_azimuth", "\ncc_number_res_coeff_azimuth: [%d]", &P::mResCoeffAzimuth),
    I("cc_border_dinstance_range", "\ncc_border_dinstance_range: [%d]", &P::mBorderRange),
    I("cc_border_dinstance_azimuth", "\ncc_border_dinstance_azimuth: [%d]", &P::mBorderAzimuth),
    D("cc_range_shift_dinst_multiple", "\ncc_range_shift_dint_multiple: [%lf]", &P::mMultipleRange),
    D("cc_azimuth_shift_dinst_multiple", "\ncc_azimuth_shift_dinst_multiple: [%lf]", &P::mMultipleAzimuth),
    F("cc_maximize_the_variance_flag", "\ncc_maximize_the_variance_flag: [%s]", &P::mMaximizeVariance),
    D("cc_variance_threshold", "\ncc_variance_threshold: [%lf]", &P::mVarianceThreshold),
    I("cc_orbit_interpolation", "\ncc_orbit_interpolation: [%d]", &P::mOrbitInterpolation),
    S("input_shape_file_name", "\ninput_shape_file_name: [%s]", &P::mShapeFile),
    F("cc_activate_test_on_orbit_flag", "\ncc_activate_test_on_orbit_flag: [%s]", &P::mOrbitTest),
    I("cc_range_win_size_test", "\ncc_range_win_size_test: [%d]", &P::mRangeWinTest),
    I("cc_azimuth_win_size_test", "\ncc_azimuth_win_size_test: [%d]", &P::mAzimuthWinTest),
    D("cc_max_shift_test", "\ncc_max_shift_test: [%lf]", &P::mMaxShiftTest),
    D("cc_validity_threshold_test", "\ncc_validity_threshold_test: [%lf]", &P::mValidityTest),
    I("cc_init_range_win_size", "\ncc_init_range_win_size: [%d]", &P::mInitRangeWin),
    I("cc_init_azimuth_win_size", "\ncc_init_azimuth_win_size: [%d]", &P::mInitAzimuthWin),
    I("cc_init_range_position", "\ncc_init_range_position: [%d]", &P::mInitRangePos),
    I("cc_init_azimuth_position", "\ncc_init_azimuth_position: [%d]", &P::mInitAzimuthPos),
    I("cc_range_win_number_cc", "\ncc_range_win_number_cc: [%d]", &P::mRangeNumberCc),
    I("cc_azimuth_win_number_cc", "\ncc_azimuth_win_number_cc: [%d]", &P::mAzimuthNumberCc),
    I("cc_range_win_size_cc", "\ncc_range_win_size_cc: [%d]", &P::mRangeWinCc),
    I("cc_azimuth_win_size_cc", "\ncc_azimuth_win_size_cc: [%d]", &P::mAzimuthWinCc),
    I("cc_oversampling_cc", "\ncc_oversampling_cc: [%d]", &P::mOversamplingCc),
    D("cc_validity_threshold_cc", "\ncc_validity_threshold_cc: [%lf]", &P::mValidityCc),
    I("cc_oversampling_fine", "\ncc_oversampling_fine: [%d]", &P::mOversamplingFine),
    I("cc_range_win_number_fine", "\ncc_range_win_number_fine: [%d]", &P::mRangeNumberFine),
    I("cc_azimuth_win_number_fine", "\ncc_azimuth_win_number_fine: [%d]", &P::mAzimuthNumberFine),
    I("cc_range_win_size_fine", "\ncc_range_win_size_fine: [%d]", &P::mRangeWinFine),
    I("cc_azimuth_win_size_fine", "\ncc_azimuth_win_size_fine: [%d]", &P::mAzimuthWinFine),
    D("cc_SNR_threshold", "\ncc_SNR_threshold: [%lf]", &P::mSnrThreshold),
    I("cc_oversampling_coherence", "\ncc_oversampling_coherence: [%d]", &P::mOversamplingCoherence),
};

SCoregParameters readParameters(const CDescription &theParameters, const STLRXCoregSwitches &theSwitches) {
  SCoregParameters aP;
  for (const SCoregKey &aKey : sCoregKeys) {
    const CDescriptionField &aField =
        theParameters.getFieldWithValue((std::string("COREGISTRATION_CMD.") + aKey.mKey).c_str());
    if (aKey.mDouble != nullptr)
      fdfLogMessage(aKey.mLog, aP.*aKey.mDouble = aField.getDouble());
    else if (aKey.mInteger != nullptr)
      fdfLogMessage(aKey.mLog, aP.*aKey.mInteger = aField.getInteger());
    else if (aKey.mFlag != nullptr)
      fdfLogMessage(aKey.mLog, (aP.*aKey.mFlag = fdfIsSwitchOn(aField.getString())) ? "TRUE" : "FALSE");
    else
      fdfLogMessage(aKey.mLog, (aP.*aKey.mText = aField.getString()).c_str());
  }
  const CDescriptionField *aReject = theParameters.findField("COREGISTRATION_CMD.cc_coh_reject_threshold");
  if (aReject != nullptr && aReject->holdsValue())
    fdfLogMessage("\ncc_coh_reject_threshold: [%lf]", aP.mCohReject = aReject->getDouble());
  else
    fdfLogMessage("\ncc_coh_reject_threshold not initialized");
  // The caller may forbid an initialisation kind whatever the file says.
  const struct {
    bool mAllowed;
    bool *mFlag;
    const char *mTrace;
  } aInhibits[] = {{theSwitches.mAllowOrbits, &aP.mInitOrbits, "\n INIBITE cc_init_from_orbits_flag"},
                   {theSwitches.mAllowAmplitude, &aP.mInitAmplitude, "\n INIBITE cc_init_from_amplitude_flag"},
                   {theSwitches.mAllowCoherence, &aP.mInitCoherence, "\n INIBITE cc_init_from_coherence_flag"}};
  for (const auto &aInhibit : aInhibits)
    if (!aInhibit.mAllowed) {
      fdfTraceMessage("%s", aInhibit.mTrace);
      *aInhibit.mFlag = false;
    }
  if (!aP.mShapeFile.empty() && aP.mShapeFile != "NotOK")
    fdfLogMessage("\nShape-file areas are not supported: the window grids cover the whole image\n");
  return aP;
}

// ------------------------------------------------------------ stage errors

enum EStage { INIT_CROSS_CORR, CENTRAL_WINDOW, COARSE, FINE };

[[noreturn]] void failStage(EStage theStage, const char *theMaster, const char *theSlave, const char *theWhy) {
  static const char *const aFormats[] = {
      "\nError occour during initialization of class Cross-Corr in image Master : [%s]\n\t\t and Slave : [%s]",
      "\nError occour during initialization of Central window in image Master : [%s]\n\t\t and Slave : [%s]",
      "\nError occour during first shift estimation form amplitude of class Cross-Corr in image Master : "
      "[%s]\n\t\t and Slave : [%s]",
      "\nError occour during fine shift estimation of class Cross-Corr in image Master : [%s]\n\t\t and Slave : "
      "[%s]"};
  static const int32_t aCodes[] = {CTLRX_ERR_COREG_INIT, CTLRX_ERR_COREG_CENTRAL, CTLRX_ERR_COREG_COARSE,
                                   CTLRX_ERR_COREG_FINE};
  fdfLogMessage(aFormats[theStage], theMaster, theSlave);
  fdfLogMessage("\n%s\n", theWhy);
  TLRX_RAISE_F(aCodes[theStage], aFormats[theStage], theMaster, theSlave);
}

// ------------------------------------------------------------ line bands

// Lines [first, first + count) of a complex raster, read whole through the
// raster file; lines kept from the previous band are not read again.
class CLineBand {
public:
  explicit CLineBand(CRasterFile &theFile) : mFile(theFile), mPixels(theFile.getNrOfPixelsPerLine()) {}

  void load(int32_t theFirst, int32_t theCount) {
    for (auto aIt = mLines.begin(); aIt != mLines.end();) {
      if (aIt->first < theFirst || aIt->first >= theFirst + theCount) {
        mSpare.push_back(std::move(aIt->second));
        aIt = mLines.erase(aIt);
      } else {
        ++aIt;
      }
    }
    for (int32_t r = theFirst; r < theFirst + theCount; ++r) {
      if (mLines.count(r) != 0)
        continue;
      SLine aLine;
      if (!mSpare.empty()) {
        aLine = std::move(mSpare.back());
        mSpare.pop_back();
      }
      aLine.mCells.resize(static_cast<size_t>(mPixels));
      aLine.mValid.resize(static_cast<size_t>(mPixels));
      mFile.getComplexLine(aLine.mCells.data(), r, 0, -1, aLine.mValid.data());
      mLines[r] = std::move(aLine);
      ++mLinesRead;
    }
  }

  // Copies a window of the band; false when a cell is no data.
  bool window(int32_t theLine0, int32_t thePixel0, int32_t theLines, int32_t thePixels, TLRXComplex *theOut) const {
    for (int32_t r = 0; r < theLines; ++r) {
      const SLine &aLine = mLines.at(theLine0 + r);
      for (int32_t c = 0; c < thePixels; ++c)
        if (aLine.mValid[static_cast<size_t>(thePixel0 + c)] == 0)
          return false;
      std::copy_n(aLine.mCells.data() + thePixel0, thePixels, theOut + static_cast<size_t>(r) * thePixels);
    }
    return true;
  }

  int64_t linesRead() const { return mLinesRead; }

private:
  struct SLine {
    std::vector<TLRXComplex> mCells;
    std::vector<uint8_t> mValid;
  };
  CRasterFile &mFile;
  int32_t mPixels;
  std::map<int32_t, SLine> mLines;
  std::vector<SLine> mSpare;
  int64_t mLinesRead = 0;
};

// ------------------------------------------------------------ window grids

struct SWindow {
  int32_t mLine0 = 0; // master
  int32_t mPixel0 = 0;
  int32_t mOffsetLine = 0; // slave window = master window + offset
  int32_t mOffsetPixel = 0;
};

struct SContext {
  const char *mMaster;
  const char *mSlave;
  CRasterFile mMasterFile;
  CRasterFile mSlaveFile;
  std::unique_ptr<CLineBand> mMasterBand;
  std::unique_ptr<CLineBand> mSlaveBand;
  int32_t mLines = 0, mPixels = 0, mSlaveLines = 0, mSlavePixels = 0;
  SCoregParameters mP;
};

// Normalised intensity variance var(I) / mean(I)^2 of a window: 1 for fully
// developed speckle, more for textured ground, less for smooth areas.
double contrastOf(const std::vector<TLRXComplex> &theWindow) {
  double aSum = 0.0, aSquares = 0.0;
  for (const TLRXComplex &aValue : theWindow) {
    const double aIntensity = std::norm(std::complex<double>(aValue));
    aSum += aIntensity;
    aSquares += aIntensity * aIntensity;
  }
  const double aMean = aSum / static_cast<double>(theWindow.size());
  return aMean > 0.0 ? (aSquares / static_cast<double>(theWindow.size()) - aMean * aMean) / (aMean * aMean) : 0.0;
}

// Start of window i of n between theLow and theHigh (first possible starts).
int32_t gridStart(int32_t i, int32_t n, int32_t theLow, int32_t theHigh) {
  if (n <= 1)
    return (theLow + theHigh) / 2;
  return theLow + static_cast<int32_t>(std::lround(static_cast<double>(i) * (theHigh - theLow) / (n - 1)));
}

struct SGrid {
  int32_t mRangeNumber;
  int32_t mAzimuthNumber;
  int32_t mLines; // window size
  int32_t mPixels;
};

// Windows of a grid over the master, kept theBorder (or the spacing multiple
// of the largest predicted shift, when more) from every edge; a window whose
// slave window would leave the slave image is not placed.
std::vector<SWindow> placeGrid(const SContext &theContext, const SGrid &theGrid, const std::vector<double> &theRange,
                               const std::vector<double> &theAzimuth) {
  const SCoregParameters &aP = theContext.mP;
  double aMaxRange = 0.0, aMaxAzimuth = 0.0;
  for (const double aX : {0.0, theContext.mPixels - 1.0})
    for (const double aY : {0.0, theContext.mLines - 1.0}) {
      aMaxRange = std::max(aMaxRange, std::fabs(fdfCoregPolyValue(theRange, aX, aY)));
      aMaxAzimuth = std::max(aMaxAzimuth, std::fabs(fdfCoregPolyValue(theAzimuth, aX, aY)));
    }
  const int32_t aBorderPixels =
      std::max(aP.mBorderRange, static_cast<int32_t>(std::ceil(aP.mMultipleRange * aMaxRange)));
  const int32_t aBorderLines =
      std::max(aP.mBorderAzimuth, static_cast<int32_t>(std::ceil(aP.mMultipleAzimuth * aMaxAzimuth)));
  const int32_t aLowPixel = aBorderPixels, aHighPixel = theContext.mPixels - aBorderPixels - theGrid.mPixels;
  const int32_t aLowLine = aBorderLines, aHighLine = theContext.mLines - aBorderLines - theGrid.mLines;
  std::vector<SWindow> aWindows;
  if (aHighPixel < aLowPixel || aHighLine < aLowLine)
    return aWindows;
  for (int32_t a = 0; a < theGrid.mAzimuthNumber; ++a)
    for (int32_t r = 0; r < theGrid.mRangeNumber; ++r) {
      SWindow aWindow;
      aWindow.mLine0 = gridStart(a, theGrid.mAzimuthNumber, aLowLine, aHighLine);
      aWindow.mPixel0 = gridStart(r, theGrid.mRangeNumber, aLowPixel, aHighPixel);
      aWindows.push_back(aWindow);
    }
  return aWindows;
}

// Moves the slave window with the predicted shift at the window centre;
// false when it leaves the slave image.
bool placeSlave(const SContext &theContext, const SGrid &theGrid, const std::vector<double> &theRange,
                const std::vector<double> &theAzimuth, SWindow &theWindow) {
  const double aX = theWindow.mPixel0 + 0.5 * (theGrid.mPixels - 1);
  const double aY = theWindow.mLine0 + 0.5 * (theGrid.mLines - 1);
  const double aRange = fdfCoregPolyValue(theRange, aX, aY), aAzimuth = fdfCoregPolyValue(theAzimuth, aX, aY);
  if (!std::isfinite(aRange) || !std::isfinite(aAzimuth) || std::fabs(aRange) > 1e7 || std::fabs(aAzimuth) > 1e7)
    return false;
  theWindow.mOffsetPixel = static_cast<int32_t>(std::lround(aRange));
  theWindow.mOffsetLine = static_cast<int32_t>(std::lround(aAzimuth));
  const int64_t aPixel0 = int64_t(theWindow.mPixel0) + theWindow.mOffsetPixel;
  const int64_t aLine0 = int64_t(theWindow.mLine0) + theWindow.mOffsetLine;
  return aPixel0 >= 0 && aPixel0 + theGrid.mPixels <= theContext.mSlavePixels && aLine0 >= 0 &&
         aLine0 + theGrid.mLines <= theContext.mSlaveLines;
}

// Shifts of the windows of a grid, one grid row (one band of lines) at a
// time. Every placed window yields a point; mAccepted tells whether the pair
// succeeded and passed theAccept.
template <typename FAccept>
std::vector<STLRXCoregPoint> measureGrid(SContext &theContext, EStage theStage, const SGrid &theGrid,
                                         const std::vector<SWindow> &theWindows, int32_t theOversampling,
                                         bool theCoherent, const std::vector<double> &theRange,
                                         const std::vector<double> &theAzimuth, FAccept theAccept) {
  CCrossCorrelator aCorrelator(theGrid.mLines, theGrid.mPixels, theOversampling, theCoherent);
  if (!aCorrelator.isValid()) {
    char aWhy[160];
    std::snprintf(aWhy, sizeof aWhy, "no FFT plan for windows of %d x %d", theGrid.mLines, theGrid.mPixels);
    failStage(theStage, theContext.mMaster, theContext.mSlave, aWhy);
  }
  std::vector<STLRXCoregPoint> aPoints;
  const SCoregParameters &aP = theContext.mP;
  const std::vector<SWindow> &aWindows = theWindows;
  const bool aVariance = aP.mMaximizeVariance && theStage != CENTRAL_WINDOW;
  const size_t aCells = static_cast<size_t>(theGrid.mLines) * static_cast<size_t>(theGrid.mPixels);
  std::vector<TLRXComplex> aMaster(aCells), aSlave(aCells), aCandidate(aCells);
  // Spacing of the grid in range: the variance criterion looks a quarter of
  // it either side.
  const int32_t aSpacing = theGrid.mRangeNumber > 1 ? (theContext.mPixels - theGrid.mPixels) / theGrid.mRangeNumber
                                                    : theGrid.mPixels;
  for (size_t aFirst = 0; aFirst < aWindows.size();) {
    size_t aEnd = aFirst;
    while (aEnd < aWindows.size() && aWindows[aEnd].mLine0 == aWindows[aFirst].mLine0)
      ++aEnd;
    fdfCheckInterruption();
    // With the variance criterion, each window moves along its line to the
    // candidate of largest contrast: centre or a quarter spacing either side.
    theContext.mMasterBand->load(aWindows[aFirst].mLine0, theGrid.mLines);
    std::vector<SWindow> aRow;
    for (size_t w = aFirst; w < aEnd; ++w) {
      SWindow aWindow = aWindows[w];
      if (aVariance) {
        double aBest = -1.0;
        int32_t aBestPixel = aWindow.mPixel0;
        for (const int32_t aMove : {0, -aSpacing / 4, aSpacing / 4}) {
          const int32_t aPixel0 = std::clamp(aWindow.mPixel0 + aMove, 0, theContext.mPixels - theGrid.mPixels);
          if (!theContext.mMasterBand->window(aWindow.mLine0, aPixel0, theGrid.mLines, theGrid.mPixels,
                                              aCandidate.data()))
            continue;
          const double aContrast = contrastOf(aCandidate);
          if (aContrast > aBest) {
            aBest = aContrast;
            aBestPixel = aPixel0;
          }
        }
        if (aBest < aP.mVarianceThreshold)
          continue;
        aWindow.mPixel0 = aBestPixel;
      }
      if (placeSlave(theContext, theGrid, theRange, theAzimuth, aWindow))
        aRow.push_back(aWindow);
    }
    aFirst = aEnd;
    if (aRow.empty())
      continue;
    int32_t aLow = theContext.mSlaveLines, aHigh = 0;
    for (const SWindow &aWindow : aRow) {
      aLow = std::min(aLow, aWindow.mLine0 + aWindow.mOffsetLine);
      aHigh = std::max(aHigh, aWindow.mLine0 + aWindow.mOffsetLine + theGrid.mLines);
    }
    theContext.mSlaveBand->load(aLow, aHigh - aLow);
    for (const SWindow &aWindow : aRow) {
      STLRXCoregPoint aPoint;
      aPoint.mPixel = aWindow.mPixel0 + 0.5 * (theGrid.mPixels - 1);
      aPoint.mLine = aWindow.mLine0 + 0.5 * (theGrid.mLines - 1);
      const bool aFilled =
          theContext.mMasterBand->window(aWindow.mLine0, aWindow.mPixel0, theGrid.mLines, theGrid.mPixels,
                                         aMaster.data()) &&
          theContext.mSlaveBand->window(aWindow.mLine0 + aWindow.mOffsetLine, aWindow.mPixel0 + aWindow.mOffsetPixel,
                                        theGrid.mLines, theGrid.mPixels, aSlave.data());
      if (aFilled) {
        const STLRXWindowShift aShift = aCorrelator.estimate(aMaster.data(), aSlave.data());
        // The increment is relative to the slave window's integer placement.
        aPoint.mRangeShift = aWindow.mOffsetPixel + aShift.mRangeShift;
        aPoint.mAzimuthShift = aWindow.mOffsetLine + aShift.mAzimuthShift;
        aPoint.mCorrelation = aShift.mCorrelation;
        aPoint.mSnr = aShift.mSnr;
        aPoint.mAccepted = aShift.valid() && theAccept(aShift);
      }
      aPoints.push_back(aPoint);
    }
  }
  return aPoints;
}

// ------------------------------------------------------------ fitting

// Normalised coordinate u in [-1, 1] over an extent: u = a x + b.
struct SAxis {
  double mA;
  double mB;
};
SAxis axisOf(double theExtent) {
  const double aHalf = std::max(0.5 * (theExtent - 1.0), 0.5);
  return {1.0 / aHalf, -0.5 * (theExtent - 1.0) / aHalf};
}

void terms(double theU, double theV, double *theOut) {
  const double aTerms[CTLRX_COREG_MAX_COEFFS] = {1.0, theU, theV, theU * theU, theU * theV, theV * theV};
  std::copy(aTerms, aTerms + CTLRX_COREG_MAX_COEFFS, theOut);
}

// Coefficients in u, v back to pixel coordinates x, y (u = ax x + bx, v =
// ay y + by); every prefix of the terms maps onto itself.
std::vector<double> toPixels(const std::vector<double> &theN, const SAxis &theX, const SAxis &theY) {
  double a[CTLRX_COREG_MAX_COEFFS] = {0, 0, 0, 0, 0, 0};
  std::copy(theN.begin(), theN.end(), a);
  const double ax = theX.mA, bx = theX.mB, ay = theY.mA, by = theY.mB;
  const double aRaw[CTLRX_COREG_MAX_COEFFS] = {
      a[0] + a[1] * bx + a[2] * by + a[3] * bx * bx + a[4] * bx * by + a[5] * by * by,
      a[1] * ax + 2 * a[3] * ax * bx + a[4] * ax * by,
      a[2] * ay + a[4] * bx * ay + 2 * a[5] * ay * by,
      a[3] * ax * ax,
      a[4] * ax * ay,
      a[5] * ay * ay};
  return std::vector<double>(aRaw, aRaw + theN.size());
}

// Least squares of one component on the used points: coefficients, the
// cofactor matrix (N^-1) and the residuals. False for a singular system.
bool solve(const std::vector<std::array<double, CTLRX_COREG_MAX_COEFFS>> &theTerms, const std::vector<double> &theValues,
           const std::vector<uint8_t> &theUsed, int32_t theCount, std::vector<double> &theCoeffs,
           std::vector<double> &theInverse) {
  const size_t n = static_cast<size_t>(theCount);
  std::vector<double> aN(n * n, 0.0), aB(n, 0.0);
  for (size_t p = 0; p < theTerms.size(); ++p) {
    if (theUsed[p] == 0)
      continue;
    for (size_t i = 0; i < n; ++i) {
      aB[i] += theTerms[p][i] * theValues[p];
      for (size_t j = 0; j < n; ++j)
        aN[i * n + j] += theTerms[p][i] * theTerms[p][j];
    }
  }
  // Gauss-Jordan with partial pivoting on [N | I].
  theInverse.assign(n * n, 0.0);
  for (size_t i = 0; i < n; ++i)
    theInverse[i * n + i] = 1.0;
  for (size_t c = 0; c < n; ++c) {
    size_t aPivot = c;
    for (size_t r = c + 1; r < n; ++r)
      if (std::fabs(aN[r * n + c]) > std::fabs(aN[aPivot * n + c]))
        aPivot = r;
    if (!(std::fabs(aN[aPivot * n + c]) > 1e-12))
      return false;
    for (size_t k = 0; k < n; ++k) {
      std::swap(aN[c * n + k], aN[aPivot * n + k]);
      std::swap(theInverse[c * n + k], theInverse[aPivot * n + k]);
    }
    const double aDiagonal = aN[c * n + c];
    for (size_t k = 0; k < n; ++k) {
      aN[c * n + k] /= aDiagonal;
      theInverse[c * n + k] /= aDiagonal;
    }
    for (size_t r = 0; r < n; ++r) {
      const double aFactor = aN[r * n + c];
      if (r == c || aFactor == 0.0)
        continue;
      for (size_t k = 0; k < n; ++k) {
        aN[r * n + k] -= aFactor * aN[c * n + k];
        theInverse[r * n + k] -= aFactor * theInverse[c * n + k];
      }
    }
  }
  theCoeffs.assign(n, 0.0);
  for (size_t i = 0; i < n; ++i)
    for (size_t j = 0; j < n; ++j)
      theCoeffs[i] += theInverse[i * n + j] * aB[j];
  return true;
}

// Residual e, s0 and the w statistic of every used point for one component.
struct SComponent {
  std::vector<double> mCoeffs;
  double mS0 = 0.0;
  std::vector<double> mW;
};

bool fitComponent(const std::vector<std::array<double, CTLRX_COREG_MAX_COEFFS>> &theTerms,
                  const std::vector<double> &theValues, const std::vector<uint8_t> &theUsed, int32_t theCount,
                  int32_t theUsedCount, SComponent &theOut) {
  std::vector<double> aInverse;
  if (!solve(theTerms, theValues, theUsed, theCount, theOut.mCoeffs, aInverse))
    return false;
  const size_t n = static_cast<size_t>(theCount);
  std::vector<double> aResiduals(theTerms.size(), 0.0), aQ(theTerms.size(), 0.0);
  double aSum = 0.0;
  for (size_t p = 0; p < theTerms.size(); ++p) {
    if (theUsed[p] == 0)
      continue;
    double aFit = 0.0, aQuad = 0.0;
    for (size_t i = 0; i < n; ++i) {
      aFit += theOut.mCoeffs[i] * theTerms[p][i];
      for (size_t j = 0; j < n; ++j)
        aQuad += theTerms[p][i] * aInverse[i * n + j] * theTerms[p][j];
    }
    aResiduals[p] = theValues[p] - aFit;
    aQ[p] = 1.0 - aQuad;
    aSum += aResiduals[p] * aResiduals[p];
  }
  const int32_t aRedundancy = theUsedCount - theCount;
  theOut.mS0 = aRedundancy > 0 ? std::sqrt(aSum / aRedundancy) : 0.0;
  theOut.mW.assign(theTerms.size(), 0.0);
  for (size_t p = 0; p < theTerms.size(); ++p)
    if (theUsed[p] != 0 && theOut.mS0 > 0.0 && aQ[p] > 1e-12)
      theOut.mW[p] = aResiduals[p] / (theOut.mS0 * std::sqrt(aQ[p]));
  return true;
}

} // namespace

double fdfCoregPolyValue(const std::vector<double> &theCoeffs, double thePixel, double theLine) {
  double aTerms[CTLRX_COREG_MAX_COEFFS];
  terms(thePixel, theLine, aTerms);
  double aValue = 0.0;
  for (size_t i = 0; i < theCoeffs.size() && i < CTLRX_COREG_MAX_COEFFS; ++i)
    aValue += theCoeffs[i] * aTerms[i];
  return aValue;
}

bool fdfFitShiftPolynomials(const std::vector<double> &thePixels, const std::vector<double> &theLines,
                            const std::vector<double> &theRange, const std::vector<double> &theAzimuth,
                            int32_t theRangeCoeffs, int32_t theAzimuthCoeffs, double theWidth, double theHeight,
                            STLRXShiftFit &theFit) {
  const int32_t aUnknowns = std::max(theRangeCoeffs, theAzimuthCoeffs);
  const size_t aCount = thePixels.size();
  theFit = STLRXShiftFit();
  theFit.mUsed.assign(aCount, 1);
  if (theRangeCoeffs < 1 || theAzimuthCoeffs < 1 || aUnknowns > CTLRX_COREG_MAX_COEFFS ||
      static_cast<int64_t>(aCount) < aUnknowns)
    return false;
  const SAxis aX = axisOf(theWidth), aY = axisOf(theHeight);
  std::vector<std::array<double, CTLRX_COREG_MAX_COEFFS>> aTerms(aCount);
  for (size_t p = 0; p < aCount; ++p)
    terms(aX.mA * thePixels[p] + aX.mB, aY.mA * theLines[p] + aY.mB, aTerms[p].data());
  int32_t aUsedCount = static_cast<int32_t>(aCount);
  SComponent aRange, aAzimuth;
  for (;;) {
    if (!fitComponent(aTerms, theRange, theFit.mUsed, theRangeCoeffs, aUsedCount, aRange) ||
        !fitComponent(aTerms, theAzimuth, theFit.mUsed, theAzimuthCoeffs, aUsedCount, aAzimuth))
      return false;
    // Stop before fewer than three times the unknowns remain.
    if (aUsedCount - 1 < 3 * aUnknowns)
      break;
    size_t aWorst = aCount;
    double aWorstW = CTLRX_COREG_SNOOPING_CRITICAL;
    for (size_t p = 0; p < aCount; ++p) {
      const double aW = std::max(std::fabs(aRange.mW[p]), std::fabs(aAzimuth.mW[p]));
      if (theFit.mUsed[p] != 0 && aW > aWorstW) {
        aWorstW = aW;
        aWorst = p;
      }
    }
    if (aWorst == aCount)
      break;
    theFit.mUsed[aWorst] = 0;
    --aUsedCount;
    ++theFit.mOutliers;
  }
  theFit.mRange = toPixels(aRange.mCoeffs, aX, aY);
  theFit.mAzimuth = toPixels(aAzimuth.mCoeffs, aX, aY);
  theFit.mRmsRange = aRange.mS0;
  theFit.mRmsAzimuth = aAzimuth.mS0;
  return true;
}

namespace {

std::string polyText(const std::vector<double> &theCoeffs) {
  std::string aText;
  char aValue[40];
  for (const double aCoeff : theCoeffs) {
    std::snprintf(aValue, sizeof aValue, "%s%.10g", aText.empty() ? "" : " ", aCoeff);
    aText += aValue;
  }
  return aText;
}

// The parameter file, as written, must be none of the files read.
void checkNames(const char *theMaster, const char *theSlave, const std::string &theParameterFile,
                const STLRXCoregSwitches &theSwitches) {
  std::vector<std::string> aInputs = {theSwitches.mCommandFile, theMaster, theSlave};
  for (const char *aRaster : {theMaster, theSlave})
    for (const char *aSuffix : {".sml", "_hdr"})
      aInputs.push_back(std::string(aRaster) + aSuffix);
  const std::string aWritten = fdfXmlHeaderFileName(fdfHeaderFileName(theParameterFile));
  for (const std::string &aInput : aInputs)
    for (const std::string &aOutput : {theParameterFile, aWritten})
      if (!aInput.empty() && (aInput == aOutput || fdfSameFile(aInput, aOutput))) {
        fdfLogMessage("\nError used the same name for input output parameter File : [%s]", theParameterFile.c_str());
        TLRX_RAISE(CTLRX_ERR_PARAMETER_FILE, theParameterFile.c_str());
      }
}

void openImages(SContext &theContext) {
  for (const char *aName : {theContext.mMaster, theContext.mSlave}) {
    const std::string aHeader = std::string(aName) + "_hdr";
    if (!fdfExistDescriptionFileOrSml(aHeader.c_str())) {
      fdfLogMessage("\n Error: missing parameter file : %s", aHeader.c_str());
      fdfTraceMessage("\n Error: missing parameter file : %s", aHeader.c_str());
      TLRX_RAISE(CTLRX_ERR_FILE_OPEN, aHeader.c_str());
    }
  }
  theContext.mMasterFile.open_read(theContext.mMaster);
  theContext.mSlaveFile.open_read(theContext.mSlave);
  theContext.mLines = theContext.mMasterFile.getNrOfLinesPerImage();
  theContext.mPixels = theContext.mMasterFile.getNrOfPixelsPerLine();
  theContext.mSlaveLines = theContext.mSlaveFile.getNrOfLinesPerImage();
  theContext.mSlavePixels = theContext.mSlaveFile.getNrOfPixelsPerLine();
  fdfTraceMessage(" aNrRow =%d\n aNrCol =%d\n", theContext.mLines, theContext.mPixels);
  for (const CRasterFile *aFile : {&theContext.mMasterFile, &theContext.mSlaveFile})
    if (!fdfIsComplexCellType(aFile->getCellType())) {
      const std::string aWhy = std::string(aFile->getFileName()) + " is not a complex image: " +
                               fdfCellTypeName(aFile->getCellType());
      failStage(INIT_CROSS_CORR, theContext.mMaster, theContext.mSlave, aWhy.c_str());
    }
  theContext.mMasterBand = std::make_unique<CLineBand>(theContext.mMasterFile);
  theContext.mSlaveBand = std::make_unique<CLineBand>(theContext.mSlaveFile);
}

// Degree guard, then every size the stages use checked before any buffer is
// sized by it.
void checkSizes(SContext &theContext) {
  SCoregParameters &aP = theContext.mP;
  if (theContext.mLines < CTLRX_COREG_MIN_SIZE_QUADRATIC || theContext.mPixels < CTLRX_COREG_MIN_SIZE_QUADRATIC) {
    if (aP.mCoeffAzimuth > 3) {
      fdfLogMessage("\n*******Image too small for using a second order polynomial (min size is : %d): decrease Az "
                    "Poly automatically to linear ********\n",
                    CTLRX_COREG_MIN_SIZE_QUADRATIC);
      aP.mCoeffAzimuth = 3;
    }
    if (aP.mCoeffRange > 3) {
      fdfLogMessage("\n*******Image too small for using a second order polynomial (min size is : %d): decrease Rg "
                    "Poly  automatically to linear ********\n",
                    CTLRX_COREG_MIN_SIZE_QUADRATIC);
      aP.mCoeffRange = 3;
    }
  }
  const struct {
    const char *mName;
    int32_t mValue;
    int32_t mMin;
    int32_t mMax;
  } aChecks[] = {
      {"cc_number_coeff_range", aP.mCoeffRange, 1, CTLRX_COREG_MAX_COEFFS},
      {"cc_number_coeff_azimuth", aP.mCoeffAzimuth, 1, CTLRX_COREG_MAX_COEFFS},
      {"cc_number_res_coeff_range", aP.mResCoeffRange, 0, CTLRX_COREG_MAX_COEFFS},
      {"cc_number_res_coeff_azimuth", aP.mResCoeffAzimuth, 0, CTLRX_COREG_MAX_COEFFS},
      {"cc_init_range_win_size", aP.mInitRangeWin, 8, theContext.mPixels},
      {"cc_init_azimuth_win_size", aP.mInitAzimuthWin, 8, theContext.mLines},
      {"cc_range_win_size_cc", aP.mRangeWinCc, 8, theContext.mPixels},
      {"cc_azimuth_win_size_cc", aP.mAzimuthWinCc, 8, theContext.mLines},
      {"cc_range_win_size_fine", aP.mRangeWinFine, 8, theContext.mPixels},
      {"cc_azimuth_win_size_fine", aP.mAzimuthWinFine, 8, theContext.mLines},
      {"cc_range_win_number_cc", aP.mRangeNumberCc, 1, 1000},
      {"cc_azimuth_win_number_cc", aP.mAzimuthNumberCc, 1, 1000},
      {"cc_range_win_number_fine", aP.mRangeNumberFine, 1, 1000},
      {"cc_azimuth_win_number_fine", aP.mAzimuthNumberFine, 1, 1000},
      {"cc_oversampling_cc", aP.mOversamplingCc, 1, 256},
      {"cc_oversampling_fine", aP.mOversamplingFine, 1, 256},
      {"cc_oversampling_coherence", aP.mOversamplingCoherence, 1, 256},
      {"cc_border_dinstance_range", aP.mBorderRange, 0, theContext.mPixels},
      {"cc_border_dinstance_azimuth", aP.mBorderAzimuth, 0, theContext.mLines},
  };
  for (const auto &aCheck : aChecks)
    if (aCheck.mValue < aCheck.mMin || aCheck.mValue > aCheck.mMax) {
      char aWhy[200];
      std::snprintf(aWhy, sizeof aWhy, "COREGISTRATION_CMD.%s is %d, expected %d to %d", aCheck.mName, aCheck.mValue,
                    aCheck.mMin, aCheck.mMax);
      failStage(INIT_CROSS_CORR, theContext.mMaster, theContext.mSlave, aWhy);
    }
}

// Initial shift: orbits (not available here: logged, and the next kind is
// used), the central window, or the start shifts.
void initialShift(SContext &theContext, int32_t theRangeLooks, int32_t theAzimuthLooks, std::vector<double> &theRange,
                  std::vector<double> &theAzimuth) {
  const SCoregParameters &aP = theContext.mP;
  // The central window keeps the ground extent of the configured one: the
  // direction with more looks (finer sampling) gets proportionally more
  // samples. No multilooking before it: the chips are correlated at full
  // resolution.
  const int32_t aTmpRgLooks = std::max(1, theRangeLooks), aTmpAzLooks = std::max(1, theAzimuthLooks);
  const int32_t aFewer = std::min(aTmpRgLooks, aTmpAzLooks);
  const auto aAdapt = [](int64_t theSize, int32_t theLimit) {
    return static_cast<int32_t>(std::min<int64_t>(theSize, std::min(theLimit, CTLRX_COREG_MAX_INIT_WINDOW)) / 2 * 2);
  };
  const int32_t aInitRangeWinSize = aAdapt(int64_t(aP.mInitRangeWin) * aTmpRgLooks / aFewer, theContext.mPixels);
  const int32_t aInitAzimuthWinSize = aAdapt(int64_t(aP.mInitAzimuthWin) * aTmpAzLooks / aFewer, theContext.mLines);
  const int aMultilookBeforCentralWin = 0;
  fdfTraceMessage("aInitRangeWinSize =%d\naInitAzimuthWinSize =%d\naTmpRgLooks =%d\naTmpAzLooks =%d\n"
                  "aMultilookBeforCentralWin =%d\n",
                  aInitRangeWinSize, aInitAzimuthWinSize, aTmpRgLooks, aTmpAzLooks, aMultilookBeforCentralWin);
  theRange = {aP.mStartRange};
  theAzimuth = {aP.mStartAzimuth};
  if (aP.mInitOrbits)
    fdfLogMessage("\nInitial shift from the orbits not available (no orbit geometry in this system): next "
                  "initialisation used\n");
  if (!aP.mInitAmplitude) {
    fdfLogMessage("\nInitial shift from the start shifts: range [%lf] azimuth [%lf]\n", theRange[0], theAzimuth[0]);
    return;
  }
  // Centred on the given position when it lies in the image, else on the
  // image centre; the slave window starts from the start shifts.
  const SGrid aGrid = {1, 1, aInitAzimuthWinSize, aInitRangeWinSize};
  const auto aCentre = [](int32_t thePosition, int32_t theExtent) {
    return thePosition >= 0 && thePosition < theExtent ? thePosition : theExtent / 2;
  };
  SWindow aWindow;
  aWindow.mPixel0 = std::clamp(aCentre(aP.mInitRangePos, theContext.mPixels) - aGrid.mPixels / 2, 0,
                               theContext.mPixels - aGrid.mPixels);
  aWindow.mLine0 = std::clamp(aCentre(aP.mInitAzimuthPos, theContext.mLines) - aGrid.mLines / 2, 0,
                              theContext.mLines - aGrid.mLines);
  const std::vector<STLRXCoregPoint> aPoints =
      measureGrid(theContext, CENTRAL_WINDOW, aGrid, {aWindow}, aP.mOversamplingCc, false, theRange, theAzimuth,
                  [&](const STLRXWindowShift &theShift) { return theShift.mCorrelation >= aP.mValidityCc; });
  if (aPoints.empty() || !aPoints[0].mAccepted) {
    char aWhy[200];
    std::snprintf(aWhy, sizeof aWhy, "central window %d x %d: %s", aGrid.mLines, aGrid.mPixels,
                  aPoints.empty() ? "outside the slave image"
                                  : "no shift with a correlation above cc_validity_threshold_cc");
    failStage(CENTRAL_WINDOW, theContext.mMaster, theContext.mSlave, aWhy);
  }
  theRange = {aPoints[0].mRangeShift};
  theAzimuth = {aPoints[0].mAzimuthShift};
  fdfLogMessage("\nInitial shift from the central window: range [%lf] azimuth [%lf] correlation [%lf]\n",
                theRange[0], theAzimuth[0], aPoints[0].mCorrelation);
}

// Accepted points of a grid, fitted; the stage fails when too few remain.
STLRXShiftFit fitStage(const SContext &theContext, EStage theStage, const std::vector<STLRXCoregPoint> &thePoints,
                       int32_t theRangeCoeffs, int32_t theAzimuthCoeffs, int32_t theMinimum,
                       std::vector<size_t> &theIndices) {
  std::vector<double> aX, aY, aR, aA;
  theIndices.clear();
  for (size_t i = 0; i < thePoints.size(); ++i)
    if (thePoints[i].mAccepted) {
      theIndices.push_back(i);
      aX.push_back(thePoints[i].mPixel);
      aY.push_back(thePoints[i].mLine);
      aR.push_back(thePoints[i].mRangeShift);
      aA.push_back(thePoints[i].mAzimuthShift);
    }
  STLRXShiftFit aFit;
  if (static_cast<int32_t>(aX.size()) < theMinimum ||
      !fdfFitShiftPolynomials(aX, aY, aR, aA, theRangeCoeffs, theAzimuthCoeffs, theContext.mPixels,
                              theContext.mLines, aFit)) {
    char aWhy[200];
    std::snprintf(aWhy, sizeof aWhy, "%d of %d windows valid, at least %d needed", static_cast<int>(aX.size()),
                  static_cast<int>(thePoints.size()), theMinimum);
    failStage(theStage, theContext.mMaster, theContext.mSlave, aWhy);
  }
  return aFit;
}

void writeParameterFile(const SContext &theContext, const char *theParameterFile, const STLRXCoregResult &theResult) {
  CDescription aParameters;
  fdfReadStandardHeader(theContext.mMaster, aParameters);
  const auto aSetVector = [&](const char *theKey, const std::vector<double> &theValues) {
    if (theValues.empty())
      return;
    CDescriptionField &aField = aParameters.getField(theKey);
    aField.setNumberOfElements(static_cast<int32_t>(theValues.size()));
    for (size_t i = 0; i < theValues.size(); ++i)
      aField.setDouble(static_cast<int32_t>(i), theValues[i]);
  };
  const SCoregParameters &aP = theContext.mP;
  aSetVector("interferometric_processing.DRangePoly", theResult.mRangePoly);
  aSetVector("interferometric_processing.DAzimuthPoly", theResult.mAzimuthPoly);
  aSetVector("interferometric_processing.DRangePolyResTopo",
             std::vector<double>(static_cast<size_t>(aP.mResCoeffRange), 0.0));
  aSetVector("interferometric_processing.DAzimuthPolyResTopo",
             std::vector<double>(static_cast<size_t>(aP.mResCoeffAzimuth), 0.0));
  aSetVector("interferometric_processing.DRangePolyInv", theResult.mRangePolyInv);
  aSetVector("interferometric_processing.DAzimuthPolyInv", theResult.mAzimuthPolyInv);
  aParameters.getField("interferometric_processing.MasterFileName").setString(theContext.mMaster);
  aParameters.getField("interferometric_processing.SlaveFileName").setString(theContext.mSlave);
  aParameters.getField("interferometric_processing.CoregistrationRmsRange").setDouble(theResult.mRmsRange);
  aParameters.getField("interferometric_processing.CoregistrationRmsAzimuth").setDouble(theResult.mRmsAzimuth);
  fdfWriteStandardHeader(theParameterFile, aParameters, true);
}

} // namespace

STLRXCoregResult fdfCoregistration(const char *theMaster, const char *theSlave, const char *theParameterFile,
                                   const CDescription &theParameters, int32_t theRangeLooks,
                                   int32_t theAzimuthLooks, const STLRXCoregSwitches &theSwitches) {
  const std::string aParameterFile = theParameterFile != nullptr ? theParameterFile : "";
  checkNames(theMaster, theSlave, aParameterFile, theSwitches);
  SContext aContext;
  aContext.mMaster = theMaster;
  aContext.mSlave = theSlave;
  aContext.mP = readParameters(theParameters, theSwitches);
  const SCoregParameters &aP = aContext.mP;
  openImages(aContext);
  checkSizes(aContext);

  STLRXCoregResult aResult;
  std::vector<double> aRange, aAzimuth;
  initialShift(aContext, theRangeLooks, theAzimuthLooks, aRange, aAzimuth);
  aResult.mInitialRange = aRange[0];
  aResult.mInitialAzimuth = aAzimuth[0];

  // Coarse grid: amplitude correlation, validity threshold on the correlation;
  // a plane once there are enough windows for the data snooping, else a constant.
  const SGrid aCoarse = {aP.mRangeNumberCc, aP.mAzimuthNumberCc, aP.mAzimuthWinCc, aP.mRangeWinCc};
  const std::vector<STLRXCoregPoint> aCoarsePoints =
      measureGrid(aContext, COARSE, aCoarse, placeGrid(aContext, aCoarse, aRange, aAzimuth), aP.mOversamplingCc,
                  false, aRange, aAzimuth,
                  [&](const STLRXWindowShift &theShift) { return theShift.mCorrelation >= aP.mValidityCc; });
  int32_t aAccepted = 0;
  for (const STLRXCoregPoint &aPoint : aCoarsePoints)
    aAccepted += aPoint.mAccepted ? 1 : 0;
  const int32_t aCoarseCoeffs = aAccepted >= 9 ? 3 : 1;
  std::vector<size_t> aIndices;
  const STLRXShiftFit aCoarseFit =
      fitStage(aContext, COARSE, aCoarsePoints, aCoarseCoeffs, aCoarseCoeffs, 1, aIndices);
  fdfLogMessage("\nCoarse estimation: %d windows, %d valid, %d outliers\nrange [%s]\nazimuth [%s]\n",
                static_cast<int>(aCoarsePoints.size()), aAccepted, aCoarseFit.mOutliers,
                polyText(aCoarseFit.mRange).c_str(), polyText(aCoarseFit.mAzimuth).c_str());

  // Fine grid: amplitude correlation with the signal-to-noise threshold, or
  // the complex windows' correlation (coherence) with its rejection threshold.
  const bool aCoherent = aP.mInitCoherence;
  const SGrid aFine = {aP.mRangeNumberFine, aP.mAzimuthNumberFine, aP.mAzimuthWinFine, aP.mRangeWinFine};
  aResult.mFinePoints = measureGrid(
      aContext, FINE, aFine, placeGrid(aContext, aFine, aCoarseFit.mRange, aCoarseFit.mAzimuth),
      aCoherent ? aP.mOversamplingCoherence : aP.mOversamplingFine, aCoherent, aCoarseFit.mRange,
      aCoarseFit.mAzimuth, [&](const STLRXWindowShift &theShift) {
        return aCoherent ? theShift.mCorrelation >= aP.mCohReject : theShift.mSnr >= aP.mSnrThreshold;
      });
  const int32_t aUnknowns = std::max(aP.mCoeffRange, aP.mCoeffAzimuth);
  const STLRXShiftFit aFit =
      fitStage(aContext, FINE, aResult.mFinePoints, aP.mCoeffRange, aP.mCoeffAzimuth, 3 * aUnknowns, aIndices);
  aResult.mFineWindows = static_cast<int32_t>(aResult.mFinePoints.size());
  aResult.mRejected = aResult.mFineWindows - static_cast<int32_t>(aIndices.size());
  aResult.mOutliers = aFit.mOutliers;
  aResult.mRangePoly = aFit.mRange;
  aResult.mAzimuthPoly = aFit.mAzimuth;
  aResult.mRmsRange = aFit.mRmsRange;
  aResult.mRmsAzimuth = aFit.mRmsAzimuth;

  // Inverse: master - slave as polynomials of the slave position, from the
  // points the forward fit kept.
  std::vector<double> aX, aY, aR, aA;
  for (size_t i = 0; i < aIndices.size(); ++i) {
    STLRXCoregPoint &aPoint = aResult.mFinePoints[aIndices[i]];
    aPoint.mUsed = aFit.mUsed[i] != 0;
    if (!aPoint.mUsed)
      continue;
    aX.push_back(aPoint.mPixel + aPoint.mRangeShift);
    aY.push_back(aPoint.mLine + aPoint.mAzimuthShift);
    aR.push_back(-aPoint.mRangeShift);
    aA.push_back(-aPoint.mAzimuthShift);
  }
  STLRXShiftFit aInverse;
  if (!fdfFitShiftPolynomials(aX, aY, aR, aA, aP.mCoeffRange, aP.mCoeffAzimuth, aContext.mSlavePixels,
                              aContext.mSlaveLines, aInverse))
    failStage(FINE, theMaster, theSlave, "the inverse polynomials cannot be fitted");
  aResult.mRangePolyInv = aInverse.mRange;
  aResult.mAzimuthPolyInv = aInverse.mAzimuth;
  aResult.mLinesRead = aContext.mMasterBand->linesRead() + aContext.mSlaveBand->linesRead();
  fdfLogMessage("\nFine estimation (%s): %d windows, %d rejected, %d outliers, rms range [%lf] azimuth [%lf]\n"
                "DRangePoly [%s]\nDAzimuthPoly [%s]\n",
                aCoherent ? "coherence" : "amplitude", aResult.mFineWindows, aResult.mRejected, aResult.mOutliers,
                aResult.mRmsRange, aResult.mRmsAzimuth, polyText(aResult.mRangePoly).c_str(),
                polyText(aResult.mAzimuthPoly).c_str());
  aContext.mMasterFile.close();
  aContext.mSlaveFile.close();
  writeParameterFile(aContext, theParameterFile, aResult);
  return aResult;
}
