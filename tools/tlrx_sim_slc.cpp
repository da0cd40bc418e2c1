// Single-look complex pair (see tlrx_sim_slc.h). The images are held whole in
// double precision: band-limiting and moving them are global operations.
//
// Master a and an independent field n are white circular Gaussian noise
// filtered to |f| <= 1 / (2 osr) in each direction (unit mean power); the
// slave before its move is g a + sqrt(1 - g^2) n. A constant shift multiplies
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

// White noise filtered to the band (centred at theDoppler cycles per line in
// azimuth), scaled to unit mean power.
TImage speckle(const SSimOptions &theOptions, int64_t theImage, double theDoppler) {
  const int32_t aLines = theOptions.mLines, aPixels = theOptions.mPixels;
  TImage aImage(static_cast<size_t>(aLines) * static_cast<size_t>(aPixels));
  CSimRandom aRandom(fdfSimKey(theOptions.mSeed, CTLRX_SIM_STREAM_SPECKLE, theImage));
  const double aHalf = std::sqrt(0.5);
  for (TComplex &aValue : aImage)
    aValue = TComplex(aHalf * aRandom.normal(), aHalf * aRandom.normal());
  CSimFft aForward(aImage, aLines, aPixels, FFTW_FORWARD), aInverse(aImage, aLines, aPixels, FFTW_BACKWARD);
  aForward.run();
  int64_t aKept = 0;
  for (int32_t l = 0; l < aLines; ++l) {
    double aFl = signedFrequency(l, aLines) - theDoppler;
    aFl -= std::round(aFl);
    const bool aInAzimuth = std::fabs(aFl) <= 0.5 / theOptions.mBandOversampling[1];
    for (int32_t p = 0; p < aPixels; ++p) {
      const bool aIn = aInAzimuth && std::fabs(signedFrequency(p, aPixels)) <= 0.5 / theOptions.mBandOversampling[0];
      TComplex &aValue = aImage[static_cast<size_t>(l) * aPixels + p];
      aValue = aIn ? aValue : TComplex(0.0, 0.0);
      aKept += aIn ? 1 : 0;
    }
  }
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

void constantShift(const SSimOptions &theOptions, TImage &theImage) {
  const int32_t aLines = theOptions.mLines, aPixels = theOptions.mPixels;
  CSimFft aForward(theImage, aLines, aPixels, FFTW_FORWARD), aInverse(theImage, aLines, aPixels, FFTW_BACKWARD);
  aForward.run();
  for (int32_t l = 0; l < aLines; ++l)
    for (int32_t p = 0; p < aPixels; ++p)
      theImage[static_cast<size_t>(l) * aPixels + p] *=
          std::polar(1.0 / static_cast<double>(theImage.size()),
                     -2.0 * CTLRX_SIM_PI *
                         (signedFrequency(p, aPixels) * theOptions.mShift[0] + signedFrequency(l, aLines) * theOptions.mShift[1]));
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
  TImage aColumn(static_cast<size_t>(aLines));
  for (int32_t c = 0; c < aPixels; ++c) {
    for (int32_t l = 0; l < aLines; ++l)
      aColumn[static_cast<size_t>(l)] = theImage[static_cast<size_t>(l) * aPixels + c];
    // Master column c sits near slave range x_s = (1 + RX) c + R0 + RY y_s.
    fdfSimEvaluateAffine(aColumn, q0 + q1 * ((1.0 + f[1]) * c + f[0]), q2 + q1 * f[2]);
    for (int32_t l = 0; l < aLines; ++l)
      theImage[static_cast<size_t>(l) * aPixels + c] = aColumn[static_cast<size_t>(l)];
  }
  TImage aLine(static_cast<size_t>(aPixels));
  for (int32_t l = 0; l < aLines; ++l) {
    std::copy_n(theImage.begin() + static_cast<ptrdiff_t>(l) * aPixels, aPixels, aLine.begin());
    fdfSimEvaluateAffine(aLine, p0 + p2 * l, p1);
    std::copy(aLine.begin(), aLine.end(), theImage.begin() + static_cast<ptrdiff_t>(l) * aPixels);
  }
}

// Interferometric phase of master x conj(slave): the ramp and the hills.
double phaseAt(const SSimOptions &theOptions, int32_t theLine, int32_t thePixel) {
  double aPhase = 2.0 * CTLRX_SIM_PI * (theOptions.mFringesPerLine * theLine + theOptions.mFringesPerPixel * thePixel);
  if (theOptions.mTopography != 0.0) {
    const double aX = thePixel / std::max(1.0, theOptions.mPixels - 1.0);
    const double aY = theLine / std::max(1.0, theOptions.mLines - 1.0);
    const double aHills[3][3] = {{0.3, 0.3, 0.15}, {0.7, 0.4, 0.2}, {0.45, 0.75, 0.12}};
    for (const auto &aHill : aHills)
      aPhase += theOptions.mTopography *
                std::exp(-((aX - aHill[0]) * (aX - aHill[0]) + (aY - aHill[1]) * (aY - aHill[1])) /
                         (2.0 * aHill[2] * aHill[2]));
  }
  return aPhase;
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
  std::snprintf(aNote, sizeof aNote, "tlrx_simulate slc image %d of 2, coherence %g, osr %g,%g, seed %llu", theImage,
                theOptions.mCoherence0, theOptions.mBandOversampling[0], theOptions.mBandOversampling[1],
                static_cast<unsigned long long>(theOptions.mSeed));
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
  TImage aMaster = speckle(aGrid, 1, theOptions.mDoppler[0]);
  TImage aSlave = speckle(aGrid, 2, theOptions.mDoppler[0]);
  const size_t aPixels = static_cast<size_t>(aGrid.mPixels);
  for (int32_t l = 0; l < aGrid.mLines; ++l)
    for (int32_t p = 0; p < aGrid.mPixels; ++p) {
      const double g = coherenceAt(theOptions, l - aPad, p - aPad);
      TComplex &aValue = aSlave[static_cast<size_t>(l) * aPixels + static_cast<size_t>(p)];
      aValue = g * aMaster[static_cast<size_t>(l) * aPixels + static_cast<size_t>(p)] + std::sqrt(1.0 - g * g) * aValue;
    }
  if (theOptions.mFieldGiven)
    affineShift(aGrid, aSlave);
  else if (theOptions.mShift[0] != 0.0 || theOptions.mShift[1] != 0.0)
    constantShift(aGrid, aSlave);
  // The slave's azimuth spectrum moved to its own Doppler centroid; fringes
  // turn the slave so that master x conj(slave) carries the phase.
  for (int32_t l = 0; l < aGrid.mLines; ++l)
    for (int32_t p = 0; p < aGrid.mPixels; ++p)
      aSlave[static_cast<size_t>(l) * aPixels + static_cast<size_t>(p)] *=
          std::polar(1.0, 2.0 * CTLRX_SIM_PI * (theOptions.mDoppler[1] - theOptions.mDoppler[0]) * l -
                              phaseAt(theOptions, l - aPad, p - aPad));
  writeImage(theOptions, 1, aMaster, aGrid.mPixels, theOptions.mDoppler[0]);
  aMaster = TImage();
  writeImage(theOptions, 2, aSlave, aGrid.mPixels, theOptions.mDoppler[1]);
  if (!theOptions.mList.empty()) {
    FILE *aList = std::fopen(theOptions.mList.c_str(), "w");
    if (aList == nullptr || std::fprintf(aList, "%s\n%s\n", fdfSimImageName(theOptions, 1).c_str(),
                                         fdfSimImageName(theOptions, 2).c_str()) < 0 || std::fclose(aList) != 0)
      TLRX_RAISE(CTLRX_ERR_FILE_WRITE, theOptions.mList.c_str());
  }
}
