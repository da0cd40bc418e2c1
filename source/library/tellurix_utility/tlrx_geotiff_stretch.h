// Grey-level stretch of GeoTIFF quick-looks, on plain values (no files):
// the rules that normalise the conversion arguments, the statistics of the
// sample, the value-to-level mapping of each data-unit family with its
// inverse, the histogram-equalised look-up table and the reduction of blocks
// of input cells to one output cell.
//
// Mapping of a valid value v to a grey level (L = top data level, 254):
//
//   level = round(S * (v - O)^E), clipped to 0..L
//   v     = O + (level / S)^(1/E)          (inverse: the centre of the level)
//
// O, S and E are written to the quick-look's header as TiffMinValue,
// TiffScale and TiffExponent, and TiffMaxValue = O + (L / S)^(1/E), so a
// reader can turn any level back into a value within one level's width.
// Phase data wrap round instead of clipping (levels 0..L cover one cycle of
// 2 pi); class numbers are their own levels. Level 255 is reserved for null
// cells and for class numbers that have no level.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

constexpr int32_t CTLRX_TIFF_LEVELS = 254;          // top data level of the callers
constexpr uint8_t CTLRX_TIFF_NULL_LEVEL = 255;      // reserved for null cells
constexpr double CTLRX_TIFF_DEFAULT_SATURATION = 1.0 / 3.0;
constexpr double CTLRX_TIFF_TINY = 1.1754943508222875e-38; // zero test of the arguments and the mean
constexpr double CTLRX_TIFF_MEAN_STAND_IN = 254.0;  // replaces a zero or undefined sample mean
constexpr double CTLRX_TIFF_MIN_EXPONENT = -0.9;    // exponents not above it count as 1
// Histogram classes: at least two; the cap keeps counts and table under 20 MB.
constexpr int32_t CTLRX_TIFF_MAX_HISTOGRAM_CLASSES = 2097152;

// How the values of a data unit become grey levels.
enum class ETLRXTiffFamily {
  kGeneral,       // mean-based stretch; signed data centred on L/2
  kIntensity,     // POWER, CALIBRATED: stretched as amplitudes
  kRaw,           // ERS RAW, JERS 1 RAW: gain only, no statistics
  kInterferogram, // phase through the colour palette
  kPhase,         // phase, grey
  kClass          // class numbers kept as levels
};

// How a block of input cells becomes one output cell.
enum class ETLRXBlockRule {
  kAverage, // mean of the valid cells
  kCentre   // the block's centre cell (classes and phases cannot be averaged)
};

ETLRXTiffFamily fdfTiffFamily(int32_t theDataUnits);
const char *fdfTiffFamilyName(ETLRXTiffFamily theFamily);
ETLRXBlockRule fdfTiffBlockRule(ETLRXTiffFamily theFamily);
// Interferograms are written with the colour palette of their header.
bool fdfTiffUsesPalette(ETLRXTiffFamily theFamily);

// ------------------------------------------------------ argument rules

// 0 (magnitude below CTLRX_TIFF_TINY) selects 1/3; negative or undefined
// saturations, which would blank or mirror the image, do too.
double fdfTiffSaturation(double theSaturation);
// Factors below 1 count as 1.
int32_t fdfTiffReductionFactor(int32_t theFactor);
// Negative gains count as 1; so do 0 and NaN, which leave no invertible stretch.
double fdfTiffGain(double theGain);
// Exponents not above -0.9 count as 1; so do 0 (a constant image) and NaN.
double fdfTiffExponent(double theExponent);
// Levels outside 1..254 count as 254 (255 is the null level).
int32_t fdfTiffLevels(int32_t theLevels);

// ------------------------------------------------------ sample statistics

// Running statistics of the valid sample values (Welford mean and variance).
class CTiffSample {
public:
  void add(double theValue);
  // Complex cells also give their parts, for the real and imaginary means.
  void addParts(double theRe, double theIm);

  int64_t count() const { return mCount; }
  double mean() const { return mMean; }
  double stdv() const; // population standard deviation
  // Mean of the square roots of the non-negative values (amplitude of intensities).
  double amplitudeMean() const;
  double minimum() const { return mMin; }
  double maximum() const { return mMax; }
  bool hasNegative() const { return mMin < 0.0; }
  bool hasParts() const { return mPartCount > 0; }
  double realMean() const;
  double imaginaryMean() const;

private:
  int64_t mCount = 0;
  double mMean = 0.0;
  double mM2 = 0.0;
  double mSqrtSum = 0.0;
  double mMin = 0.0;
  double mMax = 0.0;
  int64_t mPartCount = 0;
  double mReSum = 0.0;
  double mImSum = 0.0;
};

// ------------------------------------------------------ histogram table

// Histogram of the sample over [low, high] in equal classes and the
// equalising table from class to level: a class gets the level of the
// middle of its share of the cumulative count. Values outside the range
// fall into the first or last class.
class CTiffHistogramLut {
public:
  // theClasses must lie in 2..CTLRX_TIFF_MAX_HISTOGRAM_CLASSES (see
  // validClassCount); an empty range is widened to one unit.
  CTiffHistogramLut(double theLow, double theHigh, int32_t theClasses, int32_t theLevels);
  static bool validClassCount(int32_t theClasses);

  void add(double theValue);
  // Builds the table from the counts; false when nothing was counted.
  bool equalise();

  uint8_t level(double theValue) const { return mLut[static_cast<size_t>(classOf(theValue))]; }
  // A value of the given level: the centre of the first class mapped to it
  // or above (the range's end for levels above every class).
  double levelValue(int32_t theLevel) const;
  double low() const { return mLow; }
  double high() const { return mHigh; }
  int32_t levels() const { return mLevels; }

private:
  int32_t classOf(double theValue) const;

  double mLow;
  double mHigh;
  double mClassesPerUnit;
  int32_t mClasses;
  int32_t mLevels;
  std::vector<uint64_t> mCounts;
  std::vector<uint8_t> mLut;
  std::vector<int32_t> mFirstClassOfLevel; // -1 when no class reaches the level
};

// ------------------------------------------------------ the stretch

enum class ETLRXStretchShape {
  kClip,  // power law, clipped to 0..L
  kWrap,  // linear, modulo L + 1 (phase)
  kClass  // the value itself; out-of-range numbers get the null level
};

struct STLRXStretch {
  double mOrigin = 0.0;   // TiffMinValue
  double mScale = 1.0;    // TiffScale
  double mExponent = 1.0; // TiffExponent
  int32_t mLevels = CTLRX_TIFF_LEVELS;
  ETLRXStretchShape mShape = ETLRXStretchShape::kClip;
  double mMean = 0.0;     // the mean the scale was made from (for the report)
  const CTiffHistogramLut *mLut = nullptr; // levels come from here when set

  uint8_t level(double theValue) const;
  // Inverse of the analytic mapping (the histogram's levels: see
  // CTiffHistogramLut::levelValue).
  double value(int32_t theLevel) const;
  double maxValue() const { return value(mLevels); } // TiffMaxValue
};

struct STLRXStretchRequest {
  ETLRXTiffFamily mFamily = ETLRXTiffFamily::kGeneral;
  double mSaturation = CTLRX_TIFF_DEFAULT_SATURATION; // after the argument rules
  double mGain = 1.0;
  double mExponent = 1.0;
  int32_t mLevels = CTLRX_TIFF_LEVELS;
  const double *mForcedMin = nullptr; // pin the ends of the stretch when given
  const double *mForcedMax = nullptr;
};

// Scale by data units (L levels, s saturation, g gain, e exponent, m the
// sample mean, 254 standing in for a zero or undefined mean):
//   raw:                 S = g, E = e, O = 0
//   any negative sample: S = 0.5 L s g / |m|, E = 1, O = -(L/2) / S (0 at L/2)
//   otherwise:           S = L s g / |m|^e, E = e, O = 0; intensities take
//                        m from the amplitudes and E = e / 2
//   phase:               S = (L + 1) / 2 pi, O = -pi + pi / (L + 1), wrapping
//   classes:             S = 1, E = 1, O = 0
// Forced limits (not for phases and classes) move O to the forced minimum
// and choose S so that the forced maximum lands on L; a window that is empty
// or not finite is ignored (traced).
STLRXStretch fdfMakeStretch(const STLRXStretchRequest &theRequest, const CTiffSample &theSample);
// The linear stretch that stands for a histogram table in the header.
STLRXStretch fdfHistogramStretch(const CTiffHistogramLut &theLut);

// Grey levels of one line: theValid[i] == 0 gives the null level.
void fdfStretchLine(const STLRXStretch &theStretch, const double *theValues, const uint8_t *theValid,
                    int32_t theCount, uint8_t *theOut);

// ------------------------------------------------------ block reduction

// Reduces theRowFactor x theColFactor blocks of cells to one cell. Lines
// are given with theOutCols x theColFactor cells; rows of a block are added
// one at a time (kCentre keeps only the row it is told is the centre).
class CTiffBlockReducer {
public:
  CTiffBlockReducer(ETLRXBlockRule theRule, int32_t theOutCols, int32_t theColFactor);
  void startBlock();
  void addRow(const double *theValues, const uint8_t *theValid);
  // The reduced line: mean or centre value, valid when any cell was.
  void finishBlock(double *theValues, uint8_t *theValid) const;
  ETLRXBlockRule rule() const { return mRule; }

private:
  ETLRXBlockRule mRule;
  int32_t mOutCols;
  int32_t mColFactor;
  std::vector<double> mSums;
  std::vector<int64_t> mCounts;
};
