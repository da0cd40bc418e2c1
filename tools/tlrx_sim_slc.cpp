// Single-look complex pair (see tlrx_sim_slc.h). The images are held whole in
// double precision: band-limiting and moving them are global operations.
//
// One white circular Gaussian reflectivity w and an independent field n are
// seen by each image through its own band (unit mean power): in azimuth
// |f - fDC| <= 1 / (2 osr) around the image's Doppler centroid, over ground
// frequencies (beyond +-0.5 cycle per line they are other content, which
// aliases into the sampled interval), in range
// |f| <= 1 / (2 osr) after the reflectivity was moved by -c (w e^(-2 pi i c x),
// c = -F b / 2 for the master and +F b / 2 for the slave, b = 1 / osr), so
// both see the same content at the same ground frequency. The master is B_m w,
// the slave before its move g B_s w + sqrt(1 - g^2) B_s n, which is the model
// g w + sqrt(1 - g^2) n seen through the slave's band while g stays sharp at
// coherence-box edges. A constant shift multiplies
// the slave's spectrum by e^(-2 pi i (f_x dx + f_y dy)). An affine field
// x_s = x + R0 + RX x + RY y, y_s = y + A0 + AX x + AY y is inverted to the
// master position of every slave pixel and the slave evaluated there, column
// by column, then line by line (the column pass takes the range position to
// first order, an error below |AX| |dx| + |RY| |dy|, 1e-3 pixel or less for
// fields of a pixel across the image). The pair is made on a grid larger by
// CTLRX_SIM_SLC_PAD on every side and cut out of it: the images are then not
// periodic, and the ringing of the line pass where its path wraps stays in the
// margin.
#include "tlrx_sim_slc.h"

#include <fftw3.h>

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <memory>

#include "tlrx_description_section.h"
#include "tlrx_errors.h"
#include "tlrx_sim_coherence_file.h"
#include "tlrx_sim_random.h"
#include "tlrx_sim_writer.h"

namespace {

constexpr double CTLRX_SIM_PI = 3.14159265358979323846264338327950288;
constexpr int32_t CTLRX_SIM_SLC_PAD = 128;
using TComplex = std::complex<double>;
using TImage = std::vector<TComplex>;

// One FFTW plan on one array, executed in place on that array.
class CSimFft {
public:
  CSimFft(TImage &theData, int theRows, int theCols, int theSign) {
    auto *aData = reinterpret_cast<fftw_complex *>(theData.data());
    mPlan = theRows == 1 ? fftw_plan_dft_1d(theCols, aData, aData, theSign, FFTW_ESTIMATE)
                         : fftw_plan_dft_2d(theRows, theCols, aData, aData, theSign, FFTW_ESTIMATE);
    if (mPlan == nullptr)
      TLRX_RAISE(CTLRX_ERR_ALLOCATION, "FFTW plan of the simulator");
  }
  ~CSimFft() { fftw_destroy_plan(mPlan); }
  CSimFft(const CSimFft &) = delete;
  CSimFft &operator=(const CSimFft &) = delete;
  void run() const { fftw_execute(mPlan); }

private:
  fftw_plan mPlan;
};

double signedFrequency(int64_t theK, int64_t theN) {
  return static_cast<double>(2 * theK <= theN ? theK : theK - theN) / static_cast<double>(theN);
}

// The band of one image: its azimuth centroid (cycles per line) and the
// offset of its range band on the ground (cycles per pixel).
struct SSimBand {
  double mDoppler = 0.0;
  double mRangeCentre = 0.0;
  bool operator==(const SSimBand &theOther) const {
    return mDoppler == theOther.mDoppler && mRangeCentre == theOther.mRangeCentre;
  }
};

// The spectrum of the white reflectivity of stream theImage: unit-power
// circular Gaussian noise moved by -theRangeCentre in range (white noise stays
// white), transformed. theAlias numbers the copy of the azimuth frequency
// interval: the ground frequency s + theAlias (s in [-0.5, 0.5] cycles per
// line) is another ground frequency than s, with content of its own, which
// only shows at s after sampling.
TImage reflectivitySpectrum(const SSimOptions &theOptions, int64_t theImage, int64_t theAlias, double theRangeCentre) {
  const int32_t aLines = theOptions.mLines, aPixels = theOptions.mPixels;
  TImage aImage(static_cast<size_t>(aLines) * static_cast<size_t>(aPixels));
  CSimRandom aRandom(fdfSimKey(theOptions.mSeed, CTLRX_SIM_STREAM_SPECKLE, theImage, theAlias));
  const double aHalf = std::sqrt(0.5);
  for (TComplex &aValue : aImage)
    aValue = TComplex(aHalf * aRandom.normal(), aHalf * aRandom.normal());
  if (theRangeCentre != 0.0) {
    // Ground frequency k + c lands on baseband k.
    std::vector<TComplex> aTurn(static_cast<size_t>(aPixels));
    for (int32_t p = 0; p < aPixels; ++p)
      aTurn[static_cast<size_t>(p)] = std::polar(1.0, -2.0 * CTLRX_SIM_PI * theRangeCentre * p);
    for (size_t i = 0; i < aImage.size(); ++i)
      aImage[i] *= aTurn[i % static_cast<size_t>(aPixels)];
  }
  CSimFft aForward(aImage, aLines, aPixels, FFTW_FORWARD);
  aForward.run();
  return aImage;
}

// The reflectivity of stream theImage seen through theBand, scaled to unit
// mean power. The same stream through two bands gives the same content at
// the same ground frequency; an azimuth band reaching past +-0.5 cycle per
// line takes the frequencies beyond from the neighbouring copy.
TImage speckle(const SSimOptions &theOptions, int64_t theImage, const SSimBand &theBand) {
  const int32_t aLines = theOptions.mLines, aPixels = theOptions.mPixels;
  // Per azimuth bin: 0 outside the band, else 1 + the copy (0, 1 or 2 for -1, 0, +1).
  std::vector<int> aCopy(static_cast<size_t>(aLines), 0);
  for (int32_t l = 0; l < aLines; ++l) {
    const double aSigned = signedFrequency(l, aLines);
    const double aAlias = -std::round(aSigned - theBand.mDoppler);
    const bool aInAzimuth = std::fabs(aSigned + aAlias - theBand.mDoppler) <= 0.5 / theOptions.mBandOversampling[1];
    aCopy[static_cast<size_t>(l)] = aInAzimuth ? 2 + static_cast<int>(aAlias) : 0;
  }
  std::vector<char> aInRange(static_cast<size_t>(aPixels));
  int64_t aRangeKept = 0;
  for (int32_t p = 0; p < aPixels; ++p) {
    aInRange[static_cast<size_t>(p)] = std::fabs(signedFrequency(p, aPixels)) <= 0.5 / theOptions.mBandOversampling[0];
    aRangeKept += aInRange[static_cast<size_t>(p)];
  }
  TImage aImage = reflectivitySpectrum(theOptions, theImage, 0, theBand.mRangeCentre);
  int64_t aKept = 0;
  for (int32_t l = 0; l < aLines; ++l) {
    const bool aRow = aCopy[static_cast<size_t>(l)] == 2;
    aKept += aCopy[static_cast<size_t>(l)] != 0 ? aRangeKept : 0;
    for (int32_t p = 0; p < aPixels; ++p)
      if (!aRow || !aInRange[static_cast<size_t>(p)])
        aImage[static_cast<size_t>(l) * aPixels + p] = TComplex(0.0, 0.0);
  }
  for (const int aAlias : {-1, 1}) {
    if (std::find(aCopy.begin(), aCopy.end(), 2 + aAlias) == aCopy.end())
      continue;
    const TImage aOther = reflectivitySpectrum(theOptions, theImage, aAlias, theBand.mRangeCentre);
    for (int32_t l = 0; l < aLines; ++l)
      if (aCopy[static_cast<size_t>(l)] == 2 + aAlias)
        for (int32_t p = 0; p < aPixels; ++p)
          if (aInRange[static_cast<size_t>(p)])
            aImage[static_cast<size_t>(l) * aPixels + p] = aOther[static_cast<size_t>(l) * aPixels + p];
  }
  CSimFft aInverse(aImage, aLines, aPixels, FFTW_BACKWARD);
  aInverse.run();
  // The forward and inverse pair multiplies by the cell count; the band keeps
  // aKept of the cells' power.
  const double aScale = 1.0 / std::sqrt(static_cast<double>(aImage.size()) * static_cast<double>(std::max<int64_t>(aKept, 1)));
  for (TComplex &aValue : aImage)
    aValue *= aScale;
  return aImage;
}

double coherenceAt(const SSimOptions &theOptions, int32_t theLine, int32_t thePixel) {
  double aCoherence = theOptions.mCoherence0 + (theOptions.mCoherence1 - theOptions.mCoherence0) * thePixel /
                                                   std::max(1.0, theOptions.mPixels - 1.0);
  for (const auto &aBox : theOptions.mCoherenceBoxes)
    if (aBox.first.contains(theLine, thePixel))
      aCoherence = aBox.second;
  return std::clamp(aCoherence, 0.0, 1.0); // the ramp continues into the margin
}

// A move along azimuth turns each frequency by its true value: the one
// nearest the slave's centroid, not the sampled one in [-0.5, 0.5).
void constantShift(const SSimOptions &theOptions, TImage &theImage) {
  const int32_t aLines = theOptions.mLines, aPixels = theOptions.mPixels;
  CSimFft aForward(theImage, aLines, aPixels, FFTW_FORWARD), aInverse(theImage, aLines, aPixels, FFTW_BACKWARD);
  aForward.run();
  const double aCentroid = theOptions.mDoppler[1];
  for (int32_t l = 0; l < aLines; ++l) {
    const double aSampled = signedFrequency(l, aLines);
    const double aAzimuth = aSampled - std::round(aSampled - aCentroid);
    for (int32_t p = 0; p < aPixels; ++p)
      theImage[static_cast<size_t>(l) * aPixels + p] *=
          std::polar(1.0 / static_cast<double>(theImage.size()),
                     -2.0 * CTLRX_SIM_PI * (signedFrequency(p, aPixels) * theOptions.mShift[0] + aAzimuth * theOptions.mShift[1]));
  }
  aInverse.run();
}

// Slave position -> master position of the affine field, by the inverse of
// [[1 + RX, RY], [AX, 1 + AY]]: x_m = p0 + p1 x_s + p2 y_s, y_m = q0 + q1 x_s + q2 y_s.
void affineShift(const SSimOptions &theOptions, TImage &theImage) {
  const double *f = theOptions.mField;
  const double aDet = (1.0 + f[1]) * (1.0 + f[5]) - f[2] * f[4];
  const double p1 = (1.0 + f[5]) / aDet, p2 = -f[2] / aDet, q1 = -f[4] / aDet, q2 = (1.0 + f[1]) / aDet;
  const double p0 = -(p1 * f[0] + p2 * f[3]), q0 = -(q1 * f[0] + q2 * f[3]);
  const int32_t aLines = theOptions.mLines, aPixels = theOptions.mPixels;
  const double aCentroid = theOptions.mDoppler[1];
  TImage aColumn(static_cast<size_t>(aLines));
  for (int32_t c = 0; c < aPixels; ++c) {
    // The column is brought to zero frequency around the slave's centroid
    // for the evaluation and turned back at the evaluated positions.
    for (int32_t l = 0; l < aLines; ++l)
      aColumn[static_cast<size_t>(l)] =
          theImage[static_cast<size_t>(l) * aPixels + c] * std::polar(1.0, -2.0 * CTLRX_SIM_PI * aCentroid * l);
    // Master column c sits near slave range x_s = (1 + RX) c + R0 + RY y_s.
    const double aStart = q0 + q1 * ((1.0 + f[1]) * c + f[0]), aStep = q2 + q1 * f[2];
    fdfSimEvaluateAffine(aColumn, aStart, aStep);
    for (int32_t l = 0; l < aLines; ++l)
      theImage[static_cast<size_t>(l) * aPixels + c] =
          aColumn[static_cast<size_t>(l)] * std::polar(1.0, 2.0 * CTLRX_SIM_PI * aCentroid * (aStart + aStep * l));
  }
  TImage aLine(static_cast<size_t>(aPixels));
  for (int32_t l = 0; l < aLines; ++l) {
    std::copy_n(theImage.begin() + static_cast<ptrdiff_t>(l) * aPixels, aPixels, aLine.begin());
    fdfSimEvaluateAffine(aLine, p0 + p2 * l, p1);
    std::copy(aLine.begin(), aLine.end(), theImage.begin() + static_cast<ptrdiff_t>(l) * aPixels);
  }
}

// Three Gaussian hills over the image, peak 1 (where they do not overlap).
double hillsAt(const SSimOptions &theOptions, int32_t theLine, int32_t thePixel) {
  const double aX = thePixel / std::max(1.0, theOptions.mPixels - 1.0);
  const double aY = theLine / std::max(1.0, theOptions.mLines - 1.0);
  const double aHills[3][3] = {{0.3, 0.3, 0.15}, {0.7, 0.4, 0.2}, {0.45, 0.75, 0.12}};
  double aSum = 0.0;
  for (const auto &aHill : aHills)
    aSum += std::exp(-((aX - aHill[0]) * (aX - aHill[0]) + (aY - aHill[1]) * (aY - aHill[1])) /
                     (2.0 * aHill[2] * aHill[2]));
  return aSum;
}

// Interferometric phase of master x conj(slave): the ramp and the hills.
double phaseAt(const SSimOptions &theOptions, int32_t theLine, int32_t thePixel) {
  double aPhase = 2.0 * CTLRX_SIM_PI * (theOptions.mFringesPerLine * theLine + theOptions.mFringesPerPixel * thePixel);
  if (theOptions.mTopography != 0.0)
    aPhase += theOptions.mTopography * hillsAt(theOptions, theLine, thePixel);
  return aPhase;
}

// The elevation model that made the hills' phase, on the master grid.
void writeElevation(const SSimOptions &theOptions) {
  SSimOptions aOptions = theOptions;
  aOptions.mCellType = CTLRX_CELL_FLOAT;
  aOptions.mScaleFactor = 1.0;
  aOptions.mNull = -9999.0; // sea level is a height
  SSimImageSpec aSpec;
  aSpec.mName = theOptions.mOut + "_dem";
  aSpec.mGrid = fdfSimImageGrid(theOptions, 1);
  aSpec.mCellType = CTLRX_CELL_FLOAT;
  aSpec.mUnits = "METERS";
  aSpec.mDate = theOptions.mDates.at(0);
  char aNote[160];
  std::snprintf(aNote, sizeof aNote, "tlrx_simulate elevation model: hills of %g m, %g rad of phase at the peak",
                theOptions.mDemHeight, theOptions.mTopography);
  aSpec.mNote = aNote;
  CSimRasterWriter aWriter(aOptions, aSpec);
  const size_t aPixels = static_cast<size_t>(theOptions.mPixels);
  std::vector<double> aHeights(aPixels);
  const std::vector<uint8_t> aValid(aPixels, 1);
  for (int32_t l = 0; l < theOptions.mLines; ++l) {
    for (size_t p = 0; p < aPixels; ++p)
      aHeights[p] = theOptions.mDemHeight * hillsAt(theOptions, l, static_cast<int32_t>(p));
    aWriter.putLine(l, aHeights.data(), nullptr, aValid.data());
  }
  aWriter.finish();
  std::printf("wrote %s: %d x %d FLOAT elevation model\n", aSpec.mName.c_str(), theOptions.mLines, theOptions.mPixels);
}

// What the interferometric steps read: a C-band geometry whose bandwidths
// follow the band oversampling.
void addSarFields(const SSimOptions &theOptions, double theDoppler, CDescription &theHeader) {
  const double aPrf = 1679.9, aRangeRate = 18.96e6;
  const struct {
    const char *mKey;
    double mValue;
  } aFields[] = {{"ChannelInfo.Wavelength", 0.05656},
                 {"ChannelInfo.PulseRepetitionFrequency", aPrf},
                 {"ChannelInfo.RangeSamplingRate", aRangeRate},
                 {"ChannelInfo.RangeBandwidth", aRangeRate / theOptions.mBandOversampling[0]},
                 {"ChannelInfo.AzimuthBandwidth", aPrf / theOptions.mBandOversampling[1]},
                 {"ChannelInfo.RangeTimeFirstPixel", 0.0055},
                 {"ChannelInfo.IncidenceAngle", 23.0},
                 {"Processing.PixelSpacingRg", 7.9},
                 {"Processing.PixelSpacingAz", 4.0}};
  for (const auto &aField : aFields)
    theHeader.getField(aField.mKey).setDouble(aField.mValue);
  CDescriptionField &aDoppler = theHeader.getField("ChannelInfo.DopplerCentroidCoeff");
  aDoppler.setNumberOfElements(1);
  aDoppler.setDouble(0, theDoppler * aPrf);
}

void writeImage(const SSimOptions &theOptions, int32_t theImage, const TImage &theValues, int32_t theStride,
                double theDoppler) {
  SSimImageSpec aSpec;
  aSpec.mName = fdfSimImageName(theOptions, theImage);
  aSpec.mGrid = fdfSimImageGrid(theOptions, theImage);
  aSpec.mCellType = theOptions.mCellType;
  aSpec.mUnits = "SLC";
  aSpec.mDate = theOptions.mDates.at(static_cast<size_t>(theImage - 1));
  char aNote[240];
  std::snprintf(aNote, sizeof aNote,
                "tlrx_simulate slc image %d of 2, coherence %g, osr %g,%g, range band shift %g, seed %llu", theImage,
                theOptions.mCoherence0, theOptions.mBandOversampling[0], theOptions.mBandOversampling[1],
                theOptions.mRangeBandShift, static_cast<unsigned long long>(theOptions.mSeed));
  aSpec.mNote = aNote;
  CSimRasterWriter aWriter(theOptions, aSpec);
  // The header is written by finish(): the SAR fields go in before.
  addSarFields(theOptions, theDoppler, aWriter.getHeader());
  const size_t aPixels = static_cast<size_t>(theOptions.mPixels);
  std::vector<double> aRe(aPixels), aIm(aPixels);
  const std::vector<uint8_t> aValid(aPixels, 1);
  const double aAmplitude = std::sqrt(theOptions.mReflectivity);
  for (int32_t l = 0; l < theOptions.mLines; ++l) {
    for (size_t p = 0; p < aPixels; ++p) {
      const TComplex aValue =
          aAmplitude * theValues[static_cast<size_t>(l + CTLRX_SIM_SLC_PAD) * static_cast<size_t>(theStride) + p +
                                 CTLRX_SIM_SLC_PAD];
      aRe[p] = aValue.real();
      aIm[p] = aValue.imag();
    }
    aWriter.putLine(l, aRe.data(), aIm.data(), aValid.data());
  }
  aWriter.finish();
  std::printf("wrote %s: %d x %d %s SLC\n", aSpec.mName.c_str(), theOptions.mLines, theOptions.mPixels,
              fdfCellTypeName(theOptions.mCellType));
}

} // namespace

void fdfSimEvaluateAffine(std::vector<std::complex<double>> &theSamples, double theStart, double theStep) {
  const int64_t n = static_cast<int64_t>(theSamples.size());
  int64_t aL = 1;
  while (aL < 2 * n - 1)
    aL *= 2;
  TImage aSpectrum(theSamples), aA(static_cast<size_t>(aL)), aB(static_cast<size_t>(aL));
  CSimFft aSpectrumFft(aSpectrum, 1, static_cast<int>(n), FFTW_FORWARD);
  CSimFft aForwardA(aA, 1, static_cast<int>(aL), FFTW_FORWARD), aForwardB(aB, 1, static_cast<int>(aL), FFTW_FORWARD);
  CSimFft aInverseA(aA, 1, static_cast<int>(aL), FFTW_BACKWARD);
  aSpectrumFft.run();
  // Signed frequencies s = m - h, m = 0..n-1; f(t) = (1/n) e^(-2 pi i h t / n)
  // sum_m G_m e^(2 pi i m t / n), and with t = start + step j the sum is
  // w^(j^2/2) sum_m [G_m e^(2 pi i m start / n) w^(m^2/2)] w^(-(j-m)^2/2),
  // w = e^(2 pi i step / n): a convolution.
  const int64_t h = n / 2;
  const auto aChirp = [&](double theSquare) { return std::polar(1.0, CTLRX_SIM_PI * theStep * theSquare / n); };
  for (int64_t m = 0; m < n; ++m) {
    const TComplex aG = aSpectrum[static_cast<size_t>(((m - h) % n + n) % n)];
    aA[static_cast<size_t>(m)] = aG * std::polar(1.0, 2.0 * CTLRX_SIM_PI * m * theStart / n) * aChirp(double(m) * m);
  }
  for (int64_t k = 0; k < n; ++k) {
    aB[static_cast<size_t>(k)] = std::conj(aChirp(double(k) * k));
    if (k > 0)
      aB[static_cast<size_t>(aL - k)] = aB[static_cast<size_t>(k)];
  }
  aForwardA.run();
  aForwardB.run();
  for (int64_t i = 0; i < aL; ++i)
    aA[static_cast<size_t>(i)] *= aB[static_cast<size_t>(i)];
  aInverseA.run();
  for (int64_t j = 0; j < n; ++j) {
    const double aT = theStart + theStep * j;
    theSamples[static_cast<size_t>(j)] = aA[static_cast<size_t>(j)] * aChirp(double(j) * j) *
                                         std::polar(1.0 / (static_cast<double>(n) * aL), -2.0 * CTLRX_SIM_PI * h * aT / n);
  }
}

void fdfSimWriteSlcPair(const SSimOptions &theOptions) {
  // The padded grid, whose field is the same at the same ground position.
  const int32_t aPad = CTLRX_SIM_SLC_PAD;
  SSimOptions aGrid = theOptions;
  aGrid.mLines += 2 * aPad;
  aGrid.mPixels += 2 * aPad;
  aGrid.mField[0] -= (theOptions.mField[1] + theOptions.mField[2]) * aPad;
  aGrid.mField[3] -= (theOptions.mField[4] + theOptions.mField[5]) * aPad;
  const double aRangeOffset = 0.5 * theOptions.mRangeBandShift / theOptions.mBandOversampling[0];
  const SSimBand aMasterBand{theOptions.mDoppler[0], -aRangeOffset}, aSlaveBand{theOptions.mDoppler[1], aRangeOffset};
  TImage aMaster = speckle(aGrid, 1, aMasterBand);
  TImage aSlave = speckle(aGrid, 2, aSlaveBand);
  {
    // The master's reflectivity through the slave's band (the master itself
    // when the bands agree).
    const TImage aCommon = aSlaveBand == aMasterBand ? TImage() : speckle(aGrid, 1, aSlaveBand);
    const TImage &aSeen = aCommon.empty() ? aMaster : aCommon;
    const size_t aPixels = static_cast<size_t>(aGrid.mPixels);
    for (int32_t l = 0; l < aGrid.mLines; ++l)
      for (int32_t p = 0; p < aGrid.mPixels; ++p) {
        const double g = coherenceAt(theOptions, l - aPad, p - aPad);
        const size_t i = static_cast<size_t>(l) * aPixels + static_cast<size_t>(p);
        aSlave[i] = g * aSeen[i] + std::sqrt(1.0 - g * g) * aSlave[i];
      }
  }
  if (theOptions.mFieldGiven)
    affineShift(aGrid, aSlave);
  else if (theOptions.mShift[0] != 0.0 || theOptions.mShift[1] != 0.0)
    constantShift(aGrid, aSlave);
  // Fringes turn the slave so that master x conj(slave) carries the phase.
  const size_t aPixels = static_cast<size_t>(aGrid.mPixels);
  for (int32_t l = 0; l < aGrid.mLines; ++l)
    for (int32_t p = 0; p < aGrid.mPixels; ++p)
      aSlave[static_cast<size_t>(l) * aPixels + static_cast<size_t>(p)] *=
          std::polar(1.0, -phaseAt(theOptions, l - aPad, p - aPad));
  writeImage(theOptions, 1, aMaster, aGrid.mPixels, theOptions.mDoppler[0]);
  aMaster = TImage();
  writeImage(theOptions, 2, aSlave, aGrid.mPixels, theOptions.mDoppler[1]);
  if (theOptions.mDemHeight > 0.0)
    writeElevation(theOptions);
  if (!theOptions.mCommandFile.empty())
    fdfSimWriteCoherenceParameters(theOptions);
  if (!theOptions.mList.empty()) {
    FILE *aList = std::fopen(theOptions.mList.c_str(), "w");
    if (aList == nullptr || std::fprintf(aList, "%s\n%s\n", fdfSimImageName(theOptions, 1).c_str(),
                                         fdfSimImageName(theOptions, 2).c_str()) < 0 || std::fclose(aList) != 0)
      TLRX_RAISE(CTLRX_ERR_FILE_WRITE, theOptions.mList.c_str());
  }
}
