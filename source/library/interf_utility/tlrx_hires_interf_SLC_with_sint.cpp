// Interferogram generation (see tlrx_hires_interf_SLC_with_sint.h). A master
// line y passes three stages: the pair line (master, resampled slave), the
// azimuth common-band filter (which needs CTLRX_AZIMUTH_FILTER_TAPS / 2 lines
// either side), and the group of CTLRX_FRINGE_GROUP lines whose fringe
// frequency sets the range common band before the range oversampling, the
// product and the multilook. Pair lines are made when a band enters (range
// passes, then azimuth passes, in parallel); the later stages run on blocks
// of whole groups and whole looks in parallel.
#include "tlrx_hires_interf_SLC_with_sint.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <complex>
#include <cstdio>
#include <deque>
#include <memory>
#include <numeric>
#include <string>
#include <vector>

#include "tlrx_common_band.h"
#include "tlrx_description_section.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"
#include "tlrx_raster_file.h"
#include "tlrx_result_files.h"
#include "tlrx_sinc_table.h"
#include "tlrx_slave_resampler.h"
#include "tlrx_standard_header.h"
#include "tlrx_step_common.h"
#include "tlrx_line_bands.h"
#include "tlrx_threads.h"

namespace {

using TCell = std::complex<float>;
using TLine = std::vector<TCell>;

constexpr double CTLRX_INTERF_EPSILON = 1.1754943508222875e-38;
constexpr double CTLRX_INTERF_PI = 3.14159265358979323846;
// Below this many lines or pixels a second-order polynomial is not trusted.
constexpr int32_t CTLRX_INTERF_SMALL_IMAGE = 600;
constexpr size_t CTLRX_INTERF_MAX_TERMS = 6;
constexpr const char *CTLRX_INTERF_BANNER =
    "*** interferogram from SLC SAR images - SINC interp.+spectral shift + doppler filter + topographic shift "
    "v6.0 apr-08";

// ------------------------------------------------------------ arguments

struct SInterfArguments {
  const char *mMaster, *mSlave, *mParameters, *mMasterPower, *mSlavePower, *mInterferogram;
  int32_t mRangeLooks = 1, mAzimuthLooks = 1;
  std::string mSyntheticPhase = "NotOK";
  bool mSpectralShift = false, mDopplerFilter = false;
  int32_t mBlockSize = 5000, mBlockOverlap = 50;
  std::string mIncidence[2] = {"NotOK", "NotOK"};
  std::string mShift[2] = {"NotOK", "NotOK"}; // range, azimuth
  bool mTopoShift = false, mWriteKernel = false, mWriteResampled = false;
};

bool isGiven(const std::string &theName) { return theName != "NotOK"; }

const char *onOff(bool theValue) { return theValue ? "TRUE" : "FALSE"; }

SInterfArguments readArguments(int argc, char **argv) {
  if (argc < 10) {
    fdfTraceMessage("Error: %d arguments, at least 9 wanted after the program name\n", argc - 1);
    TLRX_RAISE(CTLRX_ERR_ARGUMENTS, nullptr);
  }
  SInterfArguments a;
  a.mMaster = argv[1];
  a.mSlave = argv[2];
  a.mParameters = argv[3];
  a.mMasterPower = argv[4];
  a.mSlavePower = argv[5];
  a.mInterferogram = argv[6];
  a.mRangeLooks = fdfIntegerToken(argv[7], "range looks", CTLRX_ERR_ARGUMENTS);
  a.mAzimuthLooks = fdfIntegerToken(argv[8], "azimuth looks", CTLRX_ERR_ARGUMENTS);
  a.mSyntheticPhase = argv[9];
  fdfTraceMessage("\n\n*** aSyntPhaseName :%s", a.mSyntheticPhase.c_str());
  const auto aText = [&](int thePosition) { return std::string(argc > thePosition ? argv[thePosition] : "NotOK"); };
  a.mSpectralShift = fdfIsSwitchOn(aText(11));
  a.mDopplerFilter = fdfIsSwitchOn(aText(12));
  fdfTraceMessage("\n\n*** aApplySpecs :%s", onOff(a.mSpectralShift));
  fdfTraceMessage("\n\n*** aApplyDopFil :%s", onOff(a.mDopplerFilter));
  if (argc > 13)
    a.mBlockSize = fdfIntegerToken(argv[13], "block size", CTLRX_ERR_ARGUMENTS);
  if (argc > 14)
    a.mBlockOverlap = fdfIntegerToken(argv[14], "block overlap", CTLRX_ERR_ARGUMENTS);
  fdfTraceMessage("Interpolation buffers size Master: [%d]\n", a.mBlockSize);
  fdfTraceMessage("Interpolation buffers overlap Master: [%d]\n", a.mBlockOverlap);
  a.mIncidence[0] = aText(15);
  a.mIncidence[1] = aText(16);
  a.mShift[0] = aText(17);
  a.mShift[1] = aText(18);
  fdfTraceMessage("\n\n*** aShRangeName :%s", a.mShift[0].c_str());
  fdfTraceMessage("\n\n*** aShAzimuthName :%s", a.mShift[1].c_str());
  a.mTopoShift = isGiven(a.mShift[0]) && isGiven(a.mShift[1]);
  fdfTraceMessage("\n\n*** aTopoShift (if false use the polinome) :%s", onOff(a.mTopoShift));
  a.mWriteKernel = fdfIsSwitchOn(aText(20));
  a.mWriteResampled = fdfIsSwitchOn(aText(21));
  fdfTraceMessage("\n\n*** write interpolation kernel :%s\n\n*** write co-registered SLC :%s\n",
                  onOff(a.mWriteKernel), onOff(a.mWriteResampled));
  if (a.mAzimuthLooks < 1 || a.mBlockSize < 1 || a.mBlockOverlap < 0) {
    fdfTraceMessage("Error: azimuth looks [%d] and block size [%d] must be at least 1, the overlap [%d] at least 0\n",
                    a.mAzimuthLooks, a.mBlockSize, a.mBlockOverlap);
    TLRX_RAISE_F(CTLRX_ERR_ARGUMENTS, "azimuth looks %d, block size %d, overlap %d", a.mAzimuthLooks, a.mBlockSize,
                 a.mBlockOverlap);
  }
  return a;
}

// ------------------------------------------------------------ looks

// The range grid of the product and its multilook: oversampled by mFactor,
// summed in groups of mGroup samples.
struct SLooks {
  int32_t mFactor = 2;
  int32_t mGroup = 2;
  int32_t mRange = 1;   // range looks of the result (1 when oversampled)
  int32_t mAzimuth = 1;
  double mSpacingRange = 1.0; // pixel spacing factor of the result
};

SLooks looksOf(int32_t theRangeLooks, int32_t theAzimuthLooks) {
  SLooks aLooks;
  aLooks.mAzimuth = theAzimuthLooks;
  if (theRangeLooks < -1) {
    aLooks.mFactor = -theRangeLooks;
    aLooks.mGroup = 1;
    aLooks.mSpacingRange = 1.0 / aLooks.mFactor;
    fdfTraceMessage("\n\n*** MAKE OVER SAMPLE IN RANGE WITH A FACTOR OF:%d", aLooks.mFactor);
  } else {
    aLooks.mRange = std::max(theRangeLooks, 1);
    aLooks.mGroup = 2 * aLooks.mRange;
    aLooks.mSpacingRange = aLooks.mRange;
  }
  fdfTraceMessage("\nnumber of interferometric looks (range,azimuth): %d, %d\n", aLooks.mRange, aLooks.mAzimuth);
  return aLooks;
}

// ------------------------------------------------------------ inputs

struct SSlcInput {
  std::string mName;
  CDescription mHeader;
  CRasterFile mRaster;
  int32_t mLines = 0;
  int32_t mPixels = 0;
};

void openSlc(SSlcInput &theInput, const char *theName, int theNumber) {
  theInput.mName = theName;
  fdfLoadInputHeader(theInput.mName, theInput.mHeader);
  const std::string aCellType = fdfHeaderText(theInput.mHeader, "RasterInfo.CellType");
  if (aCellType != "SHORT_COMPLEX" && aCellType != "FLOAT_COMPLEX") {
    fdfTraceMessage("Error: unsupported data type: %s for input file %d\n", aCellType.c_str(), theNumber);
    fdfLogMessage("Error: unsupported data type: %s for input file %d\n", aCellType.c_str(), theNumber);
    TLRX_RAISE_F(CTLRX_ERR_IMAGES_INCOMPATIBLE, "%.64s (input file %d: %.200s)", aCellType.c_str(), theNumber,
                 theName);
  }
  theInput.mRaster.open_read(theName, theInput.mHeader);
  theInput.mLines = theInput.mRaster.getNrOfLinesPerImage();
  theInput.mPixels = theInput.mRaster.getNrOfPixelsPerLine();
}

// An image too small for its looks gives no result line or pixel: refused
// before anything is read.
void checkOutputSize(const SSlcInput &theMaster, const SLooks &theLooks) {
  if (theMaster.mPixels * theLooks.mFactor / theLooks.mGroup >= 1 && theMaster.mLines / theLooks.mAzimuth >= 1)
    return;
  fdfTraceMessage("Error: %d x %d pixels give no result line with %d range and %d azimuth looks\n", theMaster.mLines,
                  theMaster.mPixels, theLooks.mRange, theLooks.mAzimuth);
  TLRX_RAISE_F(CTLRX_ERR_OUTPUT_SIZE, "%.200s: %d x %d", theMaster.mName.c_str(), theMaster.mLines, theMaster.mPixels);
}

// Complex line with no-data cells as 0 + 0i, the value the chain treats as
// no data.
void readSlcLine(CRasterFile &theRaster, int32_t theLine, TCell *theCells, std::vector<uint8_t> &theValid) {
  theRaster.getComplexLine(theCells, theLine, 0, -1, theValid.data());
  for (size_t i = 0; i < theValid.size(); ++i)
    if (theValid[i] == 0)
      theCells[i] = TCell(0.0F, 0.0F);
}

bool headerNumber(const CDescription &theHeader, const char *theKey, double &theValue) {
  const CDescriptionField *aField = theHeader.findField(theKey);
  if (aField == nullptr || !aField->holdsValue())
    return false;
  theValue = aField->getDouble();
  return true;
}

std::vector<double> headerVector(const CDescription &theHeader, const char *theKey) {
  std::vector<double> aValues;
  const CDescriptionField *aField = theHeader.findField(theKey);
  if (aField != nullptr && aField->holdsValue())
    for (int32_t i = 0; i < aField->getNumberOfElements(); ++i)
      aValues.push_back(aField->getDouble(i));
  return aValues;
}

// The forward polynomials with their residual-topography terms added, and
// the inverse azimuth polynomial that maps a slave line back to the master.
struct SPolynomials {
  std::vector<double> mRange, mAzimuth, mAzimuthInverse;
};

SPolynomials readPolynomials(const CDescription &theParameters, const char *theFile) {
  fdfTraceMessage("\n------ Read: parameter file with polinomes");
  SPolynomials aPoly;
  aPoly.mRange = headerVector(theParameters, "interferometric_processing.DRangePoly");
  aPoly.mAzimuth = headerVector(theParameters, "interferometric_processing.DAzimuthPoly");
  for (const auto &aRequired : {std::make_pair("DRangePoly", &aPoly.mRange), {"DAzimuthPoly", &aPoly.mAzimuth}})
    if (aRequired.second->empty()) {
      fdfTraceMessage("Error: missing parameter field %s\n", aRequired.first);
      TLRX_RAISE_F(CTLRX_ERR_DS_FIELD_MISSING, "interferometric_processing.%s in %.200s", aRequired.first, theFile);
    }
  // The slave lines the range pass resamples are mapped back to the master
  // by the inverse polynomials.
  if (headerVector(theParameters, "interferometric_processing.DRangePolyInv").empty() ||
      (aPoly.mAzimuthInverse = headerVector(theParameters, "interferometric_processing.DAzimuthPolyInv")).empty()) {
    fdfTraceMessage("Error: missing parameter field DRangePolyInv, or DAzimuthPolyInv\n");
    fdfLogMessage("Error: missing parameter field DRangePolyInv, or DAzimuthPolyInv\n");
    TLRX_RAISE_F(CTLRX_ERR_DS_FIELD_MISSING, "DRangePolyInv, or DAzimuthPolyInv in %.200s", theFile);
  }
  const auto aAddResidual = [&](std::vector<double> &thePoly, const char *theKey) {
    const std::vector<double> aResidual = headerVector(theParameters, theKey);
    if (aResidual.size() > thePoly.size())
      thePoly.resize(aResidual.size(), 0.0);
    for (size_t i = 0; i < aResidual.size(); ++i)
      thePoly[i] += aResidual[i];
  };
  aAddResidual(aPoly.mRange, "interferometric_processing.DRangePolyResTopo");
  aAddResidual(aPoly.mAzimuth, "interferometric_processing.DAzimuthPolyResTopo");
  // The shift fields evaluate terms 1, x, y, x^2, x y, y^2 only.
  for (const auto &aPolynomial : {std::make_pair("DRangePoly", &aPoly.mRange), {"DAzimuthPoly", &aPoly.mAzimuth},
                                  {"DAzimuthPolyInv", &aPoly.mAzimuthInverse}})
    if (aPolynomial.second->size() > CTLRX_INTERF_MAX_TERMS) {
      fdfTraceMessage("Error: %s has %zu terms, at most %zu are used\n", aPolynomial.first, aPolynomial.second->size(),
                      CTLRX_INTERF_MAX_TERMS);
      TLRX_RAISE_F(CTLRX_ERR_DS_TYPE, "interferometric_processing.%s: %zu terms in %.200s", aPolynomial.first,
                   aPolynomial.second->size(), theFile);
    }
  return aPoly;
}

void adviseSmallImage(int32_t theLines, int32_t thePixels, const SPolynomials &thePoly) {
  fdfTraceMessage("Image size Master = col[%d] x row[%d]\n", thePixels, theLines);
  if (std::min(theLines, thePixels) >= CTLRX_INTERF_SMALL_IMAGE ||
      std::max(thePoly.mRange.size(), thePoly.mAzimuth.size()) <= 3)
    return;
  fdfLogMessage("In case of images with dimension smaller than [%d]. Is suggest the usage of a linear "
                "co-registration polynomial instead a second order degree\n",
                CTLRX_INTERF_SMALL_IMAGE);
  fdfLogMessage("See Default values > Coregistration > azimuth & range dependency : it should be at maximum 3 \n");
}

// Inputs read but not used by the computation are still checked to exist.
void acceptIncidence(const SInterfArguments &theArgs) {
  for (const std::string &aName : theArgs.mIncidence)
    if (isGiven(aName)) {
      CDescription aHeader;
      fdfLoadInputHeader(aName, aHeader);
      fdfLogMessage("\nlocal incidence raster %s accepted and not used: the spectral shift is measured on the "
                    "interferogram\n",
                    aName.c_str());
    }
}

// ------------------------------------------------------------ filters

// Centroid per column of an image: from its header, else from its data.
std::vector<double> centroidOfImage(SSlcInput &theInput, const char *theRole) {
  std::vector<double> aCentroid;
  if (fdfDopplerFromHeader(theInput.mHeader, theInput.mPixels, aCentroid)) {
    fdfLogMessage("\n%s Doppler centroid from the header: %g of the PRF at the first column\n", theRole,
                  aCentroid.empty() ? 0.0 : aCentroid.front());
    return aCentroid;
  }
  std::vector<uint8_t> aValid(static_cast<size_t>(theInput.mPixels));
  aCentroid = fdfEstimateDoppler(
      [&](int32_t theLine, TCell *theCells) { readSlcLine(theInput.mRaster, theLine, theCells, aValid); },
      theInput.mLines, theInput.mPixels);
  fdfLogMessage("\n%s Doppler centroid estimated from the data: %g of the PRF at the first column\n", theRole,
                aCentroid.empty() ? 0.0 : aCentroid.front());
  return aCentroid;
}

// Centroid per master column (theColumns) of an image: from its header,
// else from its data; an image narrower than the master repeats its last
// column's value.
std::vector<double> centroidOf(SSlcInput &theInput, const char *theRole, int32_t theColumns) {
  std::vector<double> aCentroid = centroidOfImage(theInput, theRole);
  aCentroid.resize(static_cast<size_t>(theColumns), aCentroid.empty() ? 0.0 : aCentroid.back());
  return aCentroid;
}

// Range bandwidth over sampling rate from the master's header; 0 (filter
// skipped with a log line) when either is missing.
double rangeBandwidth(const SSlcInput &theMaster, double &theRate) {
  double aBandwidth = 0.0;
  if (headerNumber(theMaster.mHeader, "ChannelInfo.RangeBandwidth", aBandwidth) &&
      headerNumber(theMaster.mHeader, "ChannelInfo.RangeSamplingRate", theRate) && aBandwidth > 0 && theRate > 0)
    return std::min(aBandwidth / theRate, 1.0);
  fdfLogMessage("\nSpectral shift filter skipped: %s has no RangeBandwidth or RangeSamplingRate\n",
                theMaster.mName.c_str());
  return 0.0;
}

std::unique_ptr<CAzimuthBandFilter> azimuthFilter(const SSlcInput &theMaster,
                                                  const std::vector<double> &theMasterCentroid,
                                                  const std::vector<double> &theSlaveCentroid) {
  double aBandwidth = 0.0, aPrf = 0.0;
  if (!headerNumber(theMaster.mHeader, "ChannelInfo.AzimuthBandwidth", aBandwidth) ||
      !headerNumber(theMaster.mHeader, "ChannelInfo.PulseRepetitionFrequency", aPrf) || aBandwidth <= 0 ||
      aPrf <= 0) {
    fdfLogMessage("\nDoppler filter skipped: %s has no AzimuthBandwidth or PulseRepetitionFrequency\n",
                  theMaster.mName.c_str());
    return nullptr;
  }
  return std::make_unique<CAzimuthBandFilter>(theMaster.mPixels, theMasterCentroid, theSlaveCentroid,
                                              std::min(aBandwidth / aPrf, 1.0));
}

// ------------------------------------------------------------ results

struct SResults {
  std::unique_ptr<CResultRaster> mInterferogram, mMasterPower, mSlavePower, mResampled[2];
  CDescription mInterferogramHeader, mMasterPowerHeader, mSlavePowerHeader, mResampledHeader[2];
};

void setByteOrder(CDescription &theHeader) {
  std::string aOrder;
  if (fdfGetEnvVar(aOrder, "TELLURIX_DEFAULT_BYTE_ORDER") && (aOrder == "MSBF" || aOrder == "LSBF"))
    fdfSetHeaderText(theHeader, "RasterInfo.BytesOrder", aOrder.c_str());
}

void makeResultHeader(CDescription &theHeader, const SSlcInput &theMaster, const SSlcInput &theSlave,
                      const char *theCellType, const char *theUnits, int32_t theLines, int32_t thePixels,
                      const SLooks &theLooks) {
  fdfMakeResultHeader(theHeader, theMaster.mHeader, theCellType, theUnits, 0.0);
  fdfSetHeaderNumber(theHeader, "RasterInfo.NrOfLinesPerImage", theLines);
  fdfSetHeaderNumber(theHeader, "RasterInfo.NrOfPixelsPerLine", thePixels);
  fdfSetHeaderNumber(theHeader, "Processing.NRangeLooks", theLooks.mRange);
  fdfSetHeaderNumber(theHeader, "Processing.NAzimuthLooks", theLooks.mAzimuth);
  double aSpacing = 0.0;
  if (headerNumber(theMaster.mHeader, "Processing.PixelSpacingRg", aSpacing))
    fdfSetHeaderNumber(theHeader, "Processing.PixelSpacingRg", aSpacing * theLooks.mSpacingRange);
  if (headerNumber(theMaster.mHeader, "Processing.PixelSpacingAz", aSpacing))
    fdfSetHeaderNumber(theHeader, "Processing.PixelSpacingAz", aSpacing * theLooks.mAzimuth);
  setByteOrder(theHeader);
  fdfStampPairHeaders(theHeader, theMaster.mName, theMaster.mHeader, theSlave.mName, theSlave.mHeader);
}

// Folder part of theName, with its separator ("" for none).
std::string folderOf(const std::string &theName) {
  const size_t aSlash = theName.find_last_of('/');
  return aSlash == std::string::npos ? std::string() : theName.substr(0, aSlash + 1);
}

std::string resampledName(const SInterfArguments &theArgs, const std::string &theInput) {
  const std::string aBase = theInput.substr(folderOf(theInput).size());
  char aName[4096];
  std::snprintf(aName, sizeof aName, "%s%s_rsp", folderOf(theArgs.mInterferogram).c_str(), aBase.c_str());
  return aName;
}

// The table of the interpolation kernel, one row per fraction.
std::string kernelName(const SInterfArguments &theArgs) {
  return folderOf(theArgs.mInterferogram) + "interf_interpolator.dat";
}

void writeKernelFile(const SInterfArguments &theArgs, CPendingFiles &thePending) {
  const std::string aName = kernelName(theArgs);
  const std::string aPart = fdfPartName(aName);
  thePending.addFile(aPart);
  FILE *aFile = std::fopen(aPart.c_str(), "w");
  bool aOk = aFile != nullptr;
  const CSincTable aTable;
  for (int32_t r = 0; aOk && r <= CTLRX_SINC_STEPS; ++r) {
    const double aFraction = static_cast<double>(r) / CTLRX_SINC_STEPS;
    const float *aWeights = aTable.weights(aFraction);
    aOk = std::fprintf(aFile, "%.6f", aFraction) > 0;
    for (int32_t k = 0; aOk && k < CTLRX_SINC_TAPS; ++k)
      aOk = std::fprintf(aFile, " %.9g", aWeights[k]) > 0;
    aOk = aOk && std::fputc('\n', aFile) != EOF;
  }
  if (aFile != nullptr && std::fclose(aFile) != 0)
    aOk = false;
  if (!aOk || std::rename(aPart.c_str(), aName.c_str()) != 0) {
    fdfTraceMessage("Error: cannot write the interpolation kernel file %s\n", aName.c_str());
    TLRX_RAISE(CTLRX_ERR_FILE_WRITE, aName.c_str());
  }
}

// ------------------------------------------------------------ the run

// Lines of one width for a contiguous range of absolute line numbers: lines
// that leave the range go to a spare pool, lines that enter it are handed
// back to be filled. Each line is a function of its number alone, so a line
// dropped and asked again gets the same values.
class CLineStore {
public:
  explicit CLineStore(size_t theWidth) : mWidth(theWidth) {}

  // Keeps the held lines of [theFirst, theLast] (none when theFirst >
  // theLast), adds the others and returns their numbers in increasing order.
  std::vector<int32_t> keep(int32_t theFirst, int32_t theLast) {
    while (!mLines.empty() && (mFirst < theFirst || theFirst > theLast)) {
      mSpare.push_back(std::move(mLines.front()));
      mLines.pop_front();
      ++mFirst;
    }
    while (!mLines.empty() && last() > theLast) {
      mSpare.push_back(std::move(mLines.back()));
      mLines.pop_back();
    }
    std::vector<int32_t> aAdded;
    if (theFirst > theLast)
      return aAdded;
    if (mLines.empty())
      mFirst = theFirst;
    for (; mFirst > theFirst; --mFirst) {
      mLines.push_front(take());
      aAdded.push_back(mFirst - 1);
    }
    std::reverse(aAdded.begin(), aAdded.end());
    while (mLines.empty() || last() < theLast) {
      mLines.push_back(take());
      aAdded.push_back(last());
    }
    return aAdded;
  }

  TCell *line(int32_t theLine) { return mLines[static_cast<size_t>(theLine - mFirst)].data(); }

private:
  int32_t last() const { return mFirst + static_cast<int32_t>(mLines.size()) - 1; }
  TLine take() {
    if (mSpare.empty())
      return TLine(mWidth);
    TLine aLine = std::move(mSpare.back());
    mSpare.pop_back();
    return aLine;
  }

  size_t mWidth;
  int32_t mFirst = 0;
  std::deque<TLine> mLines;
  std::vector<TLine> mSpare;
};

// Lines per block of the parallel run: whole fringe groups and whole azimuth
// looks, so that no estimate and no multilook sum straddles two blocks; at
// least 32 lines to keep the per-block work well above its cost.
int32_t blockLines(int32_t theAzimuthLooks) {
  const int32_t aBase = std::lcm(CTLRX_FRINGE_GROUP, std::max(1, theAzimuthLooks));
  return aBase * ((32 + aBase - 1) / aBase);
}

// A block of master lines after the pair lines are made: the azimuth filter,
// the fringe groups, the range oversampling, the product and the multilook.
// One per thread: its buffers are its own.
struct SBlockWorker {
  SBlockWorker(int32_t thePixels, int32_t theFactor, int32_t theOutPixels)
      : mFringe(thePixels), mMasterOversampler(thePixels, theFactor), mSlaveOversampler(thePixels, theFactor),
        mGroupMaster(CTLRX_FRINGE_GROUP, TLine(static_cast<size_t>(thePixels))),
        mGroupSlave(CTLRX_FRINGE_GROUP, TLine(static_cast<size_t>(thePixels))),
        mMasterOver(static_cast<size_t>(thePixels) * theFactor), mSlaveOver(mMasterOver.size()),
        mProduct(mMasterOver.size()), mSumProduct(static_cast<size_t>(theOutPixels)),
        mSumMaster(static_cast<size_t>(theOutPixels)), mSumSlave(static_cast<size_t>(theOutPixels)) {}

  CFringeEstimator mFringe;
  CRangeOversampler mMasterOversampler, mSlaveOversampler;
  SResampleScratch mScratch;
  std::vector<TLine> mGroupMaster, mGroupSlave;
  TLine mMasterOver, mSlaveOver, mProduct;
  std::vector<std::complex<double>> mSumProduct;
  std::vector<double> mSumMaster, mSumSlave;
  int64_t mProcessed = 0;
};

// The fringe frequency a group found, added to the mean in group order.
struct SGroupFringe {
  bool mFound = false;
  double mFringe = 0.0;
};

class CInterferogramRun {
public:
  // theBlockSize bounds the slave lines a master line's shifts reach over.
  CInterferogramRun(SSlcInput &theMaster, SSlcInput &theSlave, CShiftField &theField, const SLooks &theLooks,
                    int32_t theBlockSize)
      : mMaster(theMaster), mSlave(theSlave), mField(theField), mLooks(theLooks), mPixels(theMaster.mPixels),
        mLines(theMaster.mLines), mOutPixels(theMaster.mPixels * theLooks.mFactor / theLooks.mGroup),
        mOutLines(theMaster.mLines / theLooks.mAzimuth), mMaxHeld(theBlockSize),
        mSlaveValid(static_cast<size_t>(theSlave.mPixels)), mMasterValid(static_cast<size_t>(theMaster.mPixels)),
        mKernel(theSlave.mLines, theSlave.mPixels, theMaster.mPixels, centroidOf(theSlave, "slave", theMaster.mPixels)),
        mPairMaster(static_cast<size_t>(theMaster.mPixels)), mPairSlave(static_cast<size_t>(theMaster.mPixels)),
        mSlaveLines(static_cast<size_t>(theMaster.mPixels)) {
    mWorkers.push_back(std::make_unique<SBlockWorker>(mPixels, mLooks.mFactor, mOutPixels));
  }

  int32_t outLines() const { return mOutLines; }
  int32_t outPixels() const { return mOutPixels; }
  int64_t processedPixels() const { return mProcessed; }
  double meanFringe() const { return mFringeCount > 0 ? mFringeSum / mFringeCount : 0.0; }

  void setFilters(double theRangeBandwidth, std::unique_ptr<CAzimuthBandFilter> theAzimuth) {
    mRangeBandwidth = theRangeBandwidth;
    mAzimuth = std::move(theAzimuth);
  }
  void setSyntheticPhase(CRasterFile *thePhase) { mPhase = thePhase; }

  // Bands of lines: the pair lines (master, resampled slave) of a band and
  // its filter margin are made on entry, range passes and azimuth passes in
  // parallel; then its blocks run in parallel into the band's result lines,
  // written in order.
  void run(SResults &theResults) {
    mResults = &theResults;
    const SBandPlan aBands = fdfLineBandPlan(mLines, blockLines(mLooks.mAzimuth), fdfThreadCount());
    while (mWorkers.size() < static_cast<size_t>(fdfThreadCount()))
      mWorkers.push_back(std::make_unique<SBlockWorker>(mPixels, mLooks.mFactor, mOutPixels));
    const size_t aBand = static_cast<size_t>(aBands.mBand), aPixels = static_cast<size_t>(mPixels);
    const size_t aOutBand = aBand / static_cast<size_t>(mLooks.mAzimuth), aOut = static_cast<size_t>(mOutPixels);
    mBandInterferogram.resize(aOutBand * aOut);
    mBandMaster.resize(aOutBand * aOut);
    mBandSlave.resize(aOutBand * aOut);
    mBandGroups.resize(aBand / CTLRX_FRINGE_GROUP);
    if (mPhase != nullptr)
      mBandPhase.resize(aBand * aPixels);
    if (mResults->mResampled[0]) {
      mBandResampled[0].resize(aBand * aPixels);
      mBandResampled[1].resize(aBand * aPixels);
    }
    CLineProgress aProgress(99.0);
    fdfRunBands(
        aBands, fdfParallelFor,
        [&](const SLineBand &theBand) {
          for (int32_t y = theBand.mFirst; y < theBand.mFirst + theBand.mCount; ++y)
            aProgress.update(y, mLines);
          enterBand(theBand.mFirst, theBand.mCount);
        },
        [&](int32_t theFirst, int32_t theCount, int theThread) {
          computeBlock(theFirst, theCount, *mWorkers[static_cast<size_t>(theThread)]);
        },
        [&](const SLineBand &theBand) { writeBand(theBand.mFirst, theBand.mCount); });
    for (const std::unique_ptr<SBlockWorker> &aWorker : mWorkers)
      mProcessed += aWorker->mProcessed;
  }

private:
  int32_t halfTaps() const { return mAzimuth ? CTLRX_AZIMUTH_FILTER_TAPS / 2 : 0; }

  // On the calling thread: progress, reads and the shift field; the new
  // slave and pair lines are then computed in parallel.
  void enterBand(int32_t theFirst, int32_t theCount) {
    mBandFirst = theFirst;
    const int32_t aFrom = std::max(0, theFirst - halfTaps());
    const int32_t aTo = std::min(mLines, theFirst + theCount + halfTaps()) - 1;
    const std::vector<int32_t> aPairs = mPairMaster.keep(aFrom, aTo);
    mPairSlave.keep(aFrom, aTo);
    const size_t aPixels = static_cast<size_t>(mPixels);
    mColumns.resize(aPairs.size() * aPixels);
    mPositions.resize(aPairs.size() * aPixels);
    int64_t aLow = INT64_MAX, aHigh = INT64_MIN;
    for (size_t k = 0; k < aPairs.size(); ++k) {
      readSlcLine(mMaster.mRaster, aPairs[k], mPairMaster.line(aPairs[k]), mMasterValid);
      double *aColumns = mColumns.data() + k * aPixels, *aLines = mPositions.data() + k * aPixels;
      mField.masterLine(aPairs[k], mPixels, aColumns, aLines);
      int64_t aFirst = 0, aLast = 0;
      if (!mKernel.window(aColumns, aLines, aFirst, aLast))
        continue;
      CResampleKernel::checkReach(aPairs[k], aFirst, aLast, mMaxHeld);
      aLow = std::min(aLow, std::max<int64_t>(0, aFirst));
      aHigh = std::max(aHigh, std::min<int64_t>(mSlave.mLines - 1, aLast));
    }
    if (aLow <= aHigh) {
      const std::vector<int32_t> aSlaveLines =
          mSlaveLines.keep(static_cast<int32_t>(aLow), static_cast<int32_t>(aHigh));
      const size_t aSlavePixels = static_cast<size_t>(mSlave.mPixels);
      mRaw.resize(aSlaveLines.size() * aSlavePixels);
      mRangeColumns.resize(aSlaveLines.size() * aPixels);
      for (size_t k = 0; k < aSlaveLines.size(); ++k) {
        readSlcLine(mSlave.mRaster, aSlaveLines[k], mRaw.data() + k * aSlavePixels, mSlaveValid);
        mField.slaveLineColumns(aSlaveLines[k], mPixels, mRangeColumns.data() + k * aPixels);
      }
      fdfParallelFor(static_cast<int64_t>(aSlaveLines.size()), [&](int64_t k, int theThread) {
        const int32_t j = aSlaveLines[static_cast<size_t>(k)];
        mKernel.rangePass(j, mRaw.data() + static_cast<size_t>(k) * aSlavePixels,
                          mRangeColumns.data() + static_cast<size_t>(k) * aPixels, mSlaveLines.line(j),
                          mWorkers[static_cast<size_t>(theThread)]->mScratch);
      });
    }
    fdfParallelFor(static_cast<int64_t>(aPairs.size()), [&](int64_t k, int theThread) {
      const size_t i = static_cast<size_t>(k);
      mKernel.azimuthPass(
          mColumns.data() + i * aPixels, mPositions.data() + i * aPixels,
          [this](int32_t theSlaveLine) -> const TCell * { return mSlaveLines.line(theSlaveLine); },
          mPairSlave.line(aPairs[i]), mWorkers[static_cast<size_t>(theThread)]->mScratch);
    });
    if (mPhase != nullptr)
      for (int32_t y = theFirst; y < theFirst + theCount; ++y)
        mPhase->getLine(phaseLine(y), y);
  }

  float *phaseLine(int32_t theLine) {
    return mBandPhase.data() + static_cast<size_t>(theLine - mBandFirst) * static_cast<size_t>(mPixels);
  }

  // Lines theFirst .. theFirst + theCount - 1 of the band, whole groups and
  // whole looks from an absolute block start.
  void computeBlock(int32_t theFirst, int32_t theCount, SBlockWorker &theWorker) {
    std::fill(theWorker.mSumProduct.begin(), theWorker.mSumProduct.end(), std::complex<double>());
    std::fill(theWorker.mSumMaster.begin(), theWorker.mSumMaster.end(), 0.0);
    std::fill(theWorker.mSumSlave.begin(), theWorker.mSumSlave.end(), 0.0);
    for (int32_t y = theFirst; y < theFirst + theCount; ++y) {
      const int32_t aSlot = y % CTLRX_FRINGE_GROUP;
      filteredLine(y, theWorker.mGroupMaster[static_cast<size_t>(aSlot)],
                   theWorker.mGroupSlave[static_cast<size_t>(aSlot)]);
      if ((y + 1) % CTLRX_FRINGE_GROUP == 0 || y + 1 == mLines)
        finishGroup(y - aSlot, aSlot + 1, theWorker);
    }
  }

  // Line theLine after the azimuth filter (a copy of the pair line without
  // it).
  void filteredLine(int32_t theLine, TLine &theMaster, TLine &theSlave) {
    const TCell *aRawMaster = mPairMaster.line(theLine), *aRawSlave = mPairSlave.line(theLine);
    if (mAzimuth) {
      const int32_t aHalf = CTLRX_AZIMUTH_FILTER_TAPS / 2;
      std::array<const TCell *, CTLRX_AZIMUTH_FILTER_TAPS> aMasters, aSlaves;
      for (int32_t k = 0; k < CTLRX_AZIMUTH_FILTER_TAPS; ++k) {
        const int32_t aLine = theLine - aHalf + k;
        const bool aInside = aLine >= 0 && aLine < mLines;
        aMasters[k] = aInside ? mPairMaster.line(aLine) : nullptr;
        aSlaves[k] = aInside ? mPairSlave.line(aLine) : nullptr;
      }
      mAzimuth->filterLine(aMasters.data(), theLine, theMaster.data());
      mAzimuth->filterLine(aSlaves.data(), theLine, theSlave.data());
      // The filter spreads no data into its neighbours' cells: a cell that
      // was no data stays so.
      for (int32_t i = 0; i < mPixels; ++i) {
        if (aRawMaster[i] == TCell())
          theMaster[i] = TCell();
        if (aRawSlave[i] == TCell())
          theSlave[i] = TCell();
      }
    } else {
      std::copy(aRawMaster, aRawMaster + mPixels, theMaster.begin());
      std::copy(aRawSlave, aRawSlave + mPixels, theSlave.begin());
    }
    if (mResults->mResampled[0]) {
      const size_t aAt = static_cast<size_t>(theLine - mBandFirst) * static_cast<size_t>(mPixels);
      std::copy(theMaster.begin(), theMaster.end(), mBandResampled[0].begin() + static_cast<std::ptrdiff_t>(aAt));
      std::copy(theSlave.begin(), theSlave.end(), mBandResampled[1].begin() + static_cast<std::ptrdiff_t>(aAt));
    }
  }

  // The range common band of the group of theCount lines from theFirst, then
  // its lines through the product.
  void finishGroup(int32_t theFirst, int32_t theCount, SBlockWorker &theWorker) {
    SRangeBand aMasterBand, aSlaveBand;
    bool aBanded = false;
    SGroupFringe &aGroup = mBandGroups[static_cast<size_t>((theFirst - mBandFirst) / CTLRX_FRINGE_GROUP)];
    aGroup = SGroupFringe();
    if (mRangeBandwidth > 0.0) {
      double aFringe = 0.0, aSnr = 0.0;
      bool aFound = false;
      if (mPhase != nullptr) {
        aFringe = phaseFringe(theFirst, theCount);
        aFound = true;
      } else {
        theWorker.mFringe.reset();
        for (int32_t i = 0; i < theCount; ++i)
          theWorker.mFringe.add(theWorker.mGroupMaster[static_cast<size_t>(i)].data(),
                                theWorker.mGroupSlave[static_cast<size_t>(i)].data());
        aFound = theWorker.mFringe.result(aFringe, aSnr);
      }
      if (aFound) {
        aBanded = fdfCommonRangeBands(aFringe, mRangeBandwidth, aMasterBand, aSlaveBand);
        aGroup = SGroupFringe{true, aFringe};
      }
    }
    for (int32_t i = 0; i < theCount; ++i)
      productLine(theFirst + i, theWorker.mGroupMaster[static_cast<size_t>(i)],
                  theWorker.mGroupSlave[static_cast<size_t>(i)], aBanded ? &aMasterBand : nullptr,
                  aBanded ? &aSlaveBand : nullptr, theWorker);
  }

  // Mean fringe frequency of the synthetic phase over the group's lines.
  double phaseFringe(int32_t theFirst, int32_t theCount) {
    double aSum = 0.0;
    for (int32_t i = 0; i < theCount; ++i)
      aSum += fdfFringeFromPhase(phaseLine(theFirst + i), mPixels, mPhase->getDummyVal());
    return aSum / static_cast<double>(theCount);
  }

  // e^(-i phase) on the oversampled grid: the synthetic phase of line
  // theLine interpolated linearly between pixels (by its wrapped step).
  void removePhase(int32_t theLine, TLine &theProduct) {
    const float *aPhase = phaseLine(theLine);
    const double aNull = mPhase->getDummyVal();
    const int32_t aFactor = mLooks.mFactor;
    for (int32_t j = 0; j < mPixels; ++j) {
      const double a0 = std::isnan(aPhase[j]) || aPhase[j] == aNull ? 0.0 : aPhase[j];
      double aStep = 0.0;
      if (j + 1 < mPixels && !std::isnan(aPhase[j + 1]) && aPhase[j + 1] != aNull) {
        aStep = aPhase[j + 1] - a0;
        aStep -= 2.0 * CTLRX_INTERF_PI * std::round(aStep / (2.0 * CTLRX_INTERF_PI));
      }
      for (int32_t k = 0; k < aFactor; ++k)
        theProduct[static_cast<size_t>(j) * aFactor + k] *=
            std::polar(1.0F, static_cast<float>(-(a0 + aStep * k / aFactor)));
    }
  }

  void productLine(int32_t theLine, const TLine &theMaster, const TLine &theSlave, const SRangeBand *theMasterBand,
                   const SRangeBand *theSlaveBand, SBlockWorker &theWorker) {
    theWorker.mMasterOversampler.process(theMaster.data(), theMasterBand, theWorker.mMasterOver.data());
    theWorker.mSlaveOversampler.process(theSlave.data(), theSlaveBand, theWorker.mSlaveOver.data());
    // Parts spelled out: the library's complex product checks for NaN on
    // every call, and this loop runs on every oversampled sample.
    const size_t aCount = theWorker.mMasterOver.size();
    const float *m = reinterpret_cast<const float *>(theWorker.mMasterOver.data());
    const float *s = reinterpret_cast<const float *>(theWorker.mSlaveOver.data());
    float *z = reinterpret_cast<float *>(theWorker.mProduct.data());
    for (size_t i = 0; i < 2 * aCount; i += 2) {
      z[i] = m[i] * s[i] + m[i + 1] * s[i + 1];
      z[i + 1] = m[i + 1] * s[i] - m[i] * s[i + 1];
    }
    dropNoData(theMaster, theSlave, theWorker);
    if (mPhase != nullptr)
      removePhase(theLine, theWorker.mProduct);
    const size_t aGroup = static_cast<size_t>(mLooks.mGroup);
    for (size_t p = 0; p < static_cast<size_t>(mOutPixels); ++p) {
      double aRe = 0.0, aIm = 0.0, aMaster = 0.0, aSlave = 0.0;
      for (size_t i = 2 * p * aGroup; i < 2 * (p + 1) * aGroup; i += 2) {
        aRe += z[i];
        aIm += z[i + 1];
        aMaster += double(m[i]) * m[i] + double(m[i + 1]) * m[i + 1];
        aSlave += double(s[i]) * s[i] + double(s[i + 1]) * s[i + 1];
      }
      theWorker.mSumProduct[p] += std::complex<double>(aRe, aIm);
      theWorker.mSumMaster[p] += aMaster;
      theWorker.mSumSlave[p] += aSlave;
    }
    if ((theLine + 1) % mLooks.mAzimuth == 0 && (theLine + 1) / mLooks.mAzimuth <= mOutLines)
      outputLine((theLine + 1) / mLooks.mAzimuth - 1, theWorker);
  }

  // A cell that is no data (0 + 0i) in either image, and the oversampled
  // samples between it and its neighbours, which carry its ringing, add
  // nothing to the sums: where every sample of a look is so, the result is
  // exactly 0 + 0i with powers 0.
  void dropNoData(const TLine &theMaster, const TLine &theSlave, SBlockWorker &theWorker) {
    const int32_t aFactor = mLooks.mFactor;
    TLine &aProduct = theWorker.mProduct, &aMasterOver = theWorker.mMasterOver, &aSlaveOver = theWorker.mSlaveOver;
    const auto aValid = [&](int32_t j) { return j >= mPixels || (theMaster[j] != TCell() && theSlave[j] != TCell()); };
    for (int32_t j = 0; j < mPixels; ++j) {
      if (aValid(j) && aValid(j + 1))
        continue;
      for (int32_t k = aValid(j) ? 1 : 0; k < aFactor; ++k) {
        const size_t i = static_cast<size_t>(j) * aFactor + k;
        aProduct[i] = aMasterOver[i] = aSlaveOver[i] = TCell();
      }
      // The samples after the previous cell lean on this one too.
      for (int32_t k = 1; j > 0 && !aValid(j) && k < aFactor; ++k) {
        const size_t i = static_cast<size_t>(j - 1) * aFactor + k;
        aProduct[i] = aMasterOver[i] = aSlaveOver[i] = TCell();
      }
    }
  }

  // Normalised product and power means of output line theLine into the
  // band's result lines.
  void outputLine(int32_t theLine, SBlockWorker &theWorker) {
    const double aLooks = static_cast<double>(mLooks.mGroup) * mLooks.mAzimuth;
    const size_t aAt = static_cast<size_t>(theLine - mBandFirst / mLooks.mAzimuth) * static_cast<size_t>(mOutPixels);
    TCell *aInterferogram = mBandInterferogram.data() + aAt;
    float *aMasterPower = mBandMaster.data() + aAt, *aSlavePower = mBandSlave.data() + aAt;
    for (int32_t p = 0; p < mOutPixels; ++p) {
      const double aSumMaster = theWorker.mSumMaster[p], aSumSlave = theWorker.mSumSlave[p];
      const double aD = std::sqrt(aSumMaster * aSumSlave);
      if (aD > CTLRX_INTERF_EPSILON || aD < -CTLRX_INTERF_EPSILON) {
        // Rounding of the sums can take |z| a hair above 1; coherence never is.
        std::complex<double> aZ = theWorker.mSumProduct[p] / aD;
        const double aNorm = std::norm(aZ);
        if (aNorm > 1.0)
          aZ /= std::sqrt(aNorm);
        aInterferogram[p] = TCell(static_cast<float>(aZ.real()), static_cast<float>(aZ.imag()));
        ++theWorker.mProcessed;
      } else {
        aInterferogram[p] = TCell();
      }
      aMasterPower[p] = static_cast<float>(aSumMaster / aLooks);
      aSlavePower[p] = static_cast<float>(aSumSlave / aLooks);
    }
    std::fill(theWorker.mSumProduct.begin(), theWorker.mSumProduct.end(), std::complex<double>());
    std::fill(theWorker.mSumMaster.begin(), theWorker.mSumMaster.end(), 0.0);
    std::fill(theWorker.mSumSlave.begin(), theWorker.mSumSlave.end(), 0.0);
  }

  // On the calling thread, in line order: the co-registered pair, the result
  // lines the band completes, and its fringe estimates into the mean.
  void writeBand(int32_t theFirst, int32_t theCount) {
    const size_t aPixels = static_cast<size_t>(mPixels), aOut = static_cast<size_t>(mOutPixels);
    if (mResults->mResampled[0])
      for (int32_t y = theFirst; y < theFirst + theCount; ++y) {
        const size_t aAt = static_cast<size_t>(y - theFirst) * aPixels;
        mResults->mResampled[0]->file().putComplexLine(y, mBandResampled[0].data() + aAt);
        mResults->mResampled[1]->file().putComplexLine(y, mBandResampled[1].data() + aAt);
      }
    const int32_t aFirstOut = theFirst / mLooks.mAzimuth;
    const int32_t aEndOut = std::min(mOutLines, (theFirst + theCount) / mLooks.mAzimuth);
    for (int32_t o = aFirstOut; o < aEndOut; ++o) {
      const size_t aAt = static_cast<size_t>(o - aFirstOut) * aOut;
      mResults->mInterferogram->file().putComplexLine(o, mBandInterferogram.data() + aAt);
      mResults->mMasterPower->file().putLine(o, mBandMaster.data() + aAt);
      mResults->mSlavePower->file().putLine(o, mBandSlave.data() + aAt);
    }
    const int32_t aGroups = (theCount + CTLRX_FRINGE_GROUP - 1) / CTLRX_FRINGE_GROUP;
    for (int32_t g = 0; g < aGroups; ++g)
      if (mBandGroups[static_cast<size_t>(g)].mFound) {
        mFringeSum += mBandGroups[static_cast<size_t>(g)].mFringe;
        ++mFringeCount;
      }
  }

  SSlcInput &mMaster;
  SSlcInput &mSlave;
  CShiftField &mField;
  SLooks mLooks;
  int32_t mPixels, mLines, mOutPixels, mOutLines, mMaxHeld;
  std::vector<uint8_t> mSlaveValid, mMasterValid;
  CResampleKernel mKernel;
  std::unique_ptr<CAzimuthBandFilter> mAzimuth;
  double mRangeBandwidth = 0.0;
  CRasterFile *mPhase = nullptr;
  SResults *mResults = nullptr;
  std::vector<std::unique_ptr<SBlockWorker>> mWorkers;

  // Lines held across bands, by absolute number: the master and resampled
  // slave of the band and its filter margin, the range-passed slave lines.
  CLineStore mPairMaster, mPairSlave, mSlaveLines;
  // The band being entered: shift field of its new pair lines, raw slave
  // lines and their range columns.
  std::vector<double> mColumns, mPositions, mRangeColumns;
  TLine mRaw;
  // The band's lines: synthetic phase, results, co-registered pair, fringes.
  int32_t mBandFirst = 0;
  std::vector<float> mBandPhase;
  TLine mBandInterferogram;
  std::vector<float> mBandMaster, mBandSlave;
  TLine mBandResampled[2];
  std::vector<SGroupFringe> mBandGroups;

  int64_t mProcessed = 0;
  double mFringeSum = 0.0;
  int64_t mFringeCount = 0;
};

void refuseClashes(const SInterfArguments &theArgs) {
  CRunFiles aFiles;
  aFiles.addInput(theArgs.mMaster);
  aFiles.addInput(theArgs.mSlave);
  for (const std::string *aName : {&theArgs.mSyntheticPhase, &theArgs.mIncidence[0], &theArgs.mIncidence[1],
                                   &theArgs.mShift[0], &theArgs.mShift[1]})
    if (isGiven(*aName))
      aFiles.addInput(*aName);
  aFiles.addInput(theArgs.mParameters);
  for (const char *aResult : {theArgs.mMasterPower, theArgs.mSlavePower, theArgs.mInterferogram})
    aFiles.addResult(aResult, false);
  if (theArgs.mWriteResampled)
    for (const char *aInput : {theArgs.mMaster, theArgs.mSlave})
      aFiles.addResult(resampledName(theArgs, aInput), false);
  if (theArgs.mWriteKernel)
    aFiles.addResult(kernelName(theArgs), false);
  aFiles.refuseClashes(CTLRX_ERR_PARAMETER_FILE);
}

void writeParameters(const char *theFile, CDescription &theParameters, int64_t theProcessed, double theShiftHz) {
  fdfTraceMessage("writing new parameters to parameter file\n");
  fdfSetHeaderNumber(theParameters, "interferometric_processing.ProcessedPixels",
                     static_cast<double>(std::min<int64_t>(theProcessed, INT32_MAX)));
  fdfSetHeaderNumber(theParameters, "interferometric_processing.SpectralShift", theShiftHz);
  fdfWriteResultHeader(theFile, theParameters, CTLRX_ERR_FILE_COPY);
}

} // namespace

int tlrx_hires_interf_SLC_with_sint(int argc, char **argv) {
  fdfTraceMessage("%s ***\n", CTLRX_INTERF_BANNER);
  const SInterfArguments aArgs = readArguments(argc, argv);
  refuseClashes(aArgs);
  SSlcInput aMaster, aSlave;
  openSlc(aMaster, aArgs.mMaster, 1);
  openSlc(aSlave, aArgs.mSlave, 2);
  CDescription aParameters;
  fdfLoadInputHeader(aArgs.mParameters, aParameters);
  acceptIncidence(aArgs);

  std::unique_ptr<CShiftField> aField;
  SPolynomials aPoly;
  if (aArgs.mTopoShift) {
    aField = std::make_unique<CRasterShiftField>(aArgs.mShift[0], aArgs.mShift[1], aMaster.mLines, aMaster.mPixels);
  } else {
    aPoly = readPolynomials(aParameters, aArgs.mParameters);
    aField = std::make_unique<CPolynomialShiftField>(aPoly.mRange, aPoly.mAzimuth, aPoly.mAzimuthInverse);
  }
  adviseSmallImage(aMaster.mLines, aMaster.mPixels, aPoly);
  const SLooks aLooks = looksOf(aArgs.mRangeLooks, aArgs.mAzimuthLooks);
  checkOutputSize(aMaster, aLooks);

  CInterferogramRun aRun(aMaster, aSlave, *aField, aLooks, aArgs.mBlockSize);
  double aRangeRate = 0.0;
  const double aBandwidth = aArgs.mSpectralShift ? rangeBandwidth(aMaster, aRangeRate) : 0.0;
  std::unique_ptr<CAzimuthBandFilter> aAzimuth;
  if (aArgs.mDopplerFilter)
    aAzimuth = azimuthFilter(aMaster, centroidOf(aMaster, "master", aMaster.mPixels),
                             centroidOf(aSlave, "slave", aMaster.mPixels));
  aRun.setFilters(aBandwidth, std::move(aAzimuth));
  CRasterFile aPhase;
  if (isGiven(aArgs.mSyntheticPhase)) {
    CDescription aPhaseHeader;
    fdfLoadInputHeader(aArgs.mSyntheticPhase, aPhaseHeader);
    aPhase.open_read(aArgs.mSyntheticPhase.c_str(), aPhaseHeader);
    if (aPhase.getNrOfLinesPerImage() != aMaster.mLines || aPhase.getNrOfPixelsPerLine() != aMaster.mPixels) {
      fdfTraceMessage("Error: the synthetic phase %s is not on the master grid (%d x %d)\n",
                      aArgs.mSyntheticPhase.c_str(), aMaster.mLines, aMaster.mPixels);
      TLRX_RAISE(CTLRX_ERR_SIZE_MISMATCH, aArgs.mSyntheticPhase.c_str());
    }
    if (aBandwidth > 0.0)
      fdfLogMessage("\n\nFIND SPECTRAL SHIFT VALUE FROM SYTHETIC PHASE :%s", aArgs.mSyntheticPhase.c_str());
    aRun.setSyntheticPhase(&aPhase);
  }

  SResults aResults;
  makeResultHeader(aResults.mInterferogramHeader, aMaster, aSlave, "FLOAT_COMPLEX", "INTERFEROGRAMME",
                   aRun.outLines(), aRun.outPixels(), aLooks);
  makeResultHeader(aResults.mMasterPowerHeader, aMaster, aSlave, "FLOAT", "POWER", aRun.outLines(),
                   aRun.outPixels(), aLooks);
  makeResultHeader(aResults.mSlavePowerHeader, aMaster, aSlave, "FLOAT", "POWER", aRun.outLines(), aRun.outPixels(),
                   aLooks);
  fdfTraceMessage("\n\nNormalization factor :%g\n", 1.0 / (static_cast<double>(aLooks.mGroup) * aLooks.mAzimuth));
  aResults.mInterferogram = std::make_unique<CResultRaster>(aArgs.mInterferogram, aResults.mInterferogramHeader);
  aResults.mMasterPower = std::make_unique<CResultRaster>(aArgs.mMasterPower, aResults.mMasterPowerHeader);
  aResults.mSlavePower = std::make_unique<CResultRaster>(aArgs.mSlavePower, aResults.mSlavePowerHeader);
  if (aArgs.mWriteResampled) {
    const SSlcInput *aInputs[2] = {&aMaster, &aSlave};
    for (int i = 0; i < 2; ++i) {
      fdfMakeResultHeader(aResults.mResampledHeader[i], aInputs[i]->mHeader, "FLOAT_COMPLEX", "SLC", 0.0);
      fdfSetHeaderNumber(aResults.mResampledHeader[i], "RasterInfo.NrOfLinesPerImage", aMaster.mLines);
      fdfSetHeaderNumber(aResults.mResampledHeader[i], "RasterInfo.NrOfPixelsPerLine", aMaster.mPixels);
      setByteOrder(aResults.mResampledHeader[i]);
      aResults.mResampled[i] =
          std::make_unique<CResultRaster>(resampledName(aArgs, aInputs[i]->mName), aResults.mResampledHeader[i]);
    }
  }
  aRun.run(aResults);
  aMaster.mRaster.close();
  aSlave.mRaster.close();
  for (CDescription *aHeader :
       {&aResults.mInterferogramHeader, &aResults.mMasterPowerHeader, &aResults.mSlavePowerHeader})
    fdfSetHeaderNumber(*aHeader, "interferometric_processing.ProcessedPixels",
                       static_cast<double>(std::min<int64_t>(aRun.processedPixels(), INT32_MAX)));
  aResults.mInterferogram->commit(aResults.mInterferogramHeader, CTLRX_ERR_FILE_COPY);
  aResults.mMasterPower->commit(aResults.mMasterPowerHeader, CTLRX_ERR_FILE_COPY);
  aResults.mSlavePower->commit(aResults.mSlavePowerHeader, CTLRX_ERR_FILE_COPY);
  for (int i = 0; i < 2; ++i)
    if (aResults.mResampled[i])
      aResults.mResampled[i]->commit(aResults.mResampledHeader[i], CTLRX_ERR_FILE_COPY);
  if (aArgs.mWriteKernel) {
    CPendingFiles aKernelPending;
    writeKernelFile(aArgs, aKernelPending);
  }
  fdfLogMessage("\nprocessed pixels: %lld, mean spectral shift: %g cycles per pixel\n",
                static_cast<long long>(aRun.processedPixels()), aRun.meanFringe());
  writeParameters(aArgs.mParameters, aParameters, aRun.processedPixels(), aRun.meanFringe() * aRangeRate);
  return 0;
}
