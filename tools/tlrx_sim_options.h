// Command line of the scene simulator: the settings of one run, read from the
// argument list through one table of options (which also prints the help),
// then checked as a whole before anything is written.
#pragma once

#include <cstdint>
#include <stdexcept>
#include <string>
#include <vector>

#include "tlrx_cell_types.h"

// Commands, also used as a bit mask of the commands an option applies to.
constexpr int CTLRX_SIM_SERIES = 1;
constexpr int CTLRX_SIM_PAIR = 2;
constexpr int CTLRX_SIM_CONSTANT = 4;
constexpr int CTLRX_SIM_SLC = 8;
constexpr int CTLRX_SIM_ALL = CTLRX_SIM_SERIES | CTLRX_SIM_PAIR | CTLRX_SIM_CONSTANT;

// Map kinds of the written images.
constexpr int CTLRX_SIM_GEO_NONE = 0;
constexpr int CTLRX_SIM_GEO_UTM = 1;
constexpr int CTLRX_SIM_GEO_GEOGRAPHIC = 2;

constexpr int32_t CTLRX_SIM_MAX_IMAGES = 9999;
constexpr int32_t CTLRX_SIM_MAX_LOOKS = 1000;

// A bad command line: the message, then the usage line, exit status 2.
class CSimUsageError : public std::runtime_error {
public:
  explicit CSimUsageError(const std::string &theMessage) : std::runtime_error(theMessage) {}
};

// A rectangle of lines and pixels of the reference grid.
struct SSimBox {
  int32_t mLine0 = 0;
  int32_t mPixel0 = 0;
  int32_t mLines = 0;
  int32_t mPixels = 0;
  bool contains(int64_t theLine, int64_t thePixel) const {
    return theLine >= mLine0 && theLine < int64_t(mLine0) + mLines && thePixel >= mPixel0 &&
           thePixel < int64_t(mPixel0) + mPixels;
  }
};

struct SSimChange {
  SSimBox mBox;
  int32_t mImage = 1;   // first image (1-based) that shows the change
  double mFactor = 1.0; // reflectivity factor from that image on
};

struct SSimTrend {
  SSimBox mBox;
  double mDbPerImage = 0.0; // image k is 10^(dB (k - 1) / 10) times brighter
};

struct SSimNoDataBox {
  SSimBox mBox;
  int32_t mImage = 0; // 0: every image
};

// Per-image replacement of the common grid: size, origin or spacing.
struct SSimImageValue {
  int32_t mImage = 0;
  double mFirst = 0.0;
  double mSecond = 0.0;
};

// Lines and pixels, and the upper-left corner and spacings of the grid in map
// units (positive spacings; north-up). Non-geocoded images use origin (0, 0)
// and spacing 1, so that map units are pixels.
struct SSimGrid {
  int32_t mLines = 0;
  int32_t mPixels = 0;
  double mX0 = 0.0;
  double mY0 = 0.0;
  double mSpacingX = 1.0;
  double mSpacingY = 1.0;
};

struct SSimOptions {
  int mCommand = 0;
  std::string mOut;
  std::string mList;
  // layout of every image
  int32_t mLines = 256;
  int32_t mPixels = 256;
  int32_t mCellType = CTLRX_CELL_FLOAT;
  std::string mUnits;     // "" for the command's default
  double mNull = 0.0;
  double mScaleFactor = 1.0;
  bool mMSBF = false;
  uint64_t mSeed = 1;
  // scene
  double mReflectivity = 1.0;
  bool mFlatScene = false;
  int32_t mFieldSize = 32;
  double mContrastDb = 6.0;
  std::vector<SSimBox> mFlatBoxes;
  // series and pair
  int32_t mCount = 5;
  bool mCountGiven = false;
  int32_t mLooks = 1;
  std::vector<SSimChange> mChanges;
  std::vector<SSimTrend> mTrends;
  // dates
  std::string mStart = "2020-01-01T10:00:00";
  double mIntervalDays = 12.0;
  std::vector<std::string> mDateTexts;
  std::vector<int64_t> mDates; // microseconds since 1970, one per image (filled by validation)
  // no data
  std::vector<SSimNoDataBox> mNoDataBoxes;
  double mNoDataFraction = 0.0;
  // geocoding
  int mGeoKind = CTLRX_SIM_GEO_NONE;
  int32_t mZone = 0;
  bool mNorth = true;
  bool mOriginGiven = false;
  bool mSpacingGiven = false;
  double mOriginX = 0.0;
  double mOriginY = 0.0;
  double mSpacingX = 0.0;
  double mSpacingY = 0.0;
  std::vector<SSimImageValue> mImageSizes;
  std::vector<SSimImageValue> mImageOrigins;
  std::vector<SSimImageValue> mImageSpacings;
  // pair
  double mCoherence0 = 0.8;
  double mCoherence1 = 0.8;
  bool mSlc = false;
  double mFringesPerLine = 0.0;
  double mFringesPerPixel = 0.0;
  // single-look complex pair: band-limited speckle, the slave moved by a
  // constant shift or an affine field (slave - master position, pixels and
  // lines, of the master position x, y), fringes and Doppler centroids
  double mBandOversampling[2] = {1.2, 1.2}; // range, azimuth: sampling rate / bandwidth
  double mShift[2] = {0.0, 0.0};            // range, azimuth
  bool mFieldGiven = false;
  double mField[6] = {0, 0, 0, 0, 0, 0};    // R0, RX, RY, A0, AX, AY
  double mTopography = 0.0;                 // peak phase of the hills, radians
  double mDoppler[2] = {0.0, 0.0};          // centroid of master and slave, fraction of the PRF
  double mRangeBandShift = 0.0;             // range band offset of the slave, fraction of the bandwidth
  std::vector<std::pair<SSimBox, double>> mCoherenceBoxes;
  double mDemHeight = 0.0;                  // peak height of the hills in ROOT_dem, metres (0: none)
  std::string mCommandFile;                 // coherence command parameter file to write ("": none)
  // constant
  bool mValueGiven = false;
  double mValueRe = 0.0;
  double mValueIm = 0.0;
};

// Reads and checks the arguments after the program name; throws
// CSimUsageError with a message that names the option and the bad value.
SSimOptions fdfSimParseOptions(const std::vector<std::string> &theArgs);
// Whether the arguments ask for the help text.
bool fdfSimWantsHelp(const std::vector<std::string> &theArgs);
// The help text, from the option table.
std::string fdfSimHelpText();
// The one-line usage reminder printed after a usage error.
const char *fdfSimUsageLine();

// Number of images the command writes, and the grids: the reference grid
// (the common size, origin and spacing) and that of image theImage (1-based)
// with its replacements.
int32_t fdfSimImageCount(const SSimOptions &theOptions);
SSimGrid fdfSimReferenceGrid(const SSimOptions &theOptions);
SSimGrid fdfSimImageGrid(const SSimOptions &theOptions, int32_t theImage);
// Name of image theImage (1-based) of a series or pair.
std::string fdfSimImageName(const SSimOptions &theOptions, int32_t theImage);
