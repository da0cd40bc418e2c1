// Series, pair and constant simulations. Every image is produced one line at
// a time from the scene, the speckle draws and the no-data mask; memory holds
// a few lines whatever the number of lines.
#include "tlrx_sim_commands.h"

#include "tlrx_errors.h"
#include "tlrx_raster_file.h"
#include "tlrx_sim_dates.h"
#include "tlrx_sim_random.h"
#include "tlrx_sim_scene.h"
#include "tlrx_sim_slc.h"
#include "tlrx_sim_writer.h"

#include <algorithm>
#include <cmath>
#include <complex>
#include <cstdio>
#include <fstream>
#include <memory>

namespace {

constexpr double CTLRX_SIM_TWO_PI = 6.283185307179586476925286766559;

// Working lines of one image.
struct SSimLines {
  explicit SSimLines(int32_t thePixels)
      : mReflectivity(static_cast<size_t>(thePixels)), mRe(static_cast<size_t>(thePixels)),
        mIm(static_cast<size_t>(thePixels)), mValid(static_cast<size_t>(thePixels)) {}
  std::vector<double> mReflectivity;
  std::vector<double> mRe;
  std::vector<double> mIm;
  std::vector<uint8_t> mValid;
};

SSimImageSpec imageSpec(const SSimOptions &theOptions, int32_t theImage, const std::string &theNote) {
  SSimImageSpec aSpec;
  aSpec.mName = fdfSimImageName(theOptions, theImage);
  aSpec.mGrid = fdfSimImageGrid(theOptions, theImage);
  aSpec.mCellType = theOptions.mCellType;
  aSpec.mUnits = theOptions.mUnits;
  aSpec.mDate = theOptions.mDates.at(static_cast<size_t>(theImage - 1));
  aSpec.mNote = theNote;
  return aSpec;
}

void report(const CSimRasterWriter &theWriter) {
  const SSimImageSpec &aSpec = theWriter.getSpec();
  std::printf("wrote %s: %d x %d %s %s, %s\n", aSpec.mName.c_str(), aSpec.mGrid.mLines, aSpec.mGrid.mPixels,
              fdfCellTypeName(aSpec.mCellType), aSpec.mUnits.c_str(), fdfSimAcquisitionText(aSpec.mDate).c_str());
  if (theWriter.getClipped() > 0)
    std::fprintf(stderr, "tlrx_simulate: warning: %lld values of %s clipped to the range of %s (see --scale-factor)\n",
                 static_cast<long long>(theWriter.getClipped()), aSpec.mName.c_str(),
                 fdfCellTypeName(aSpec.mCellType));
}

void writeList(const SSimOptions &theOptions, const std::vector<std::string> &theNames) {
  if (theOptions.mList.empty())
    return;
  std::ofstream aList(theOptions.mList, std::ios::trunc);
  for (const std::string &aName : theNames)
    aList << aName << "\n";
  aList.close();
  if (!aList)
    TLRX_RAISE(CTLRX_ERR_FILE_WRITE, theOptions.mList.c_str());
  std::printf("wrote list %s\n", theOptions.mList.c_str());
}

// One speckle draw at reflectivity theR: an L-look intensity, or its square
// root, or a complex value of that intensity and a uniform phase.
void speckle(CSimRandom &theRandom, const SSimOptions &theOptions, bool theComplex, bool theAmplitude, double theR,
             double &theRe, double &theIm) {
  const double aIntensity = theR * theRandom.gamma(theOptions.mLooks) / theOptions.mLooks;
  if (theComplex) {
    const double aModulus = std::sqrt(aIntensity);
    const double aPhase = CTLRX_SIM_TWO_PI * theRandom.uniform();
    theRe = aModulus * std::cos(aPhase);
    theIm = aModulus * std::sin(aPhase);
    return;
  }
  theRe = theAmplitude ? std::sqrt(aIntensity) : aIntensity;
  theIm = 0.0;
}

void writeSeriesImage(const SSimOptions &theOptions, const CSimScene &theScene, int32_t theImage) {
  char aNote[160];
  std::snprintf(aNote, sizeof aNote, "tlrx_simulate series image %d of %d, seed %llu, looks %d", theImage,
                theOptions.mCount, static_cast<unsigned long long>(theOptions.mSeed), theOptions.mLooks);
  CSimRasterWriter aWriter(theOptions, imageSpec(theOptions, theImage, aNote));
  const SSimGrid &aGrid = aWriter.getSpec().mGrid;
  const CSimImageSampler aSampler(theScene, theOptions, aGrid, theImage);
  CSimRandom aSpeckle(fdfSimKey(theOptions.mSeed, CTLRX_SIM_STREAM_SPECKLE, theImage));
  CSimRandom aNoData(fdfSimKey(theOptions.mSeed, CTLRX_SIM_STREAM_NODATA, theImage));
  const bool aComplex = fdfIsComplexCellType(theOptions.mCellType);
  const bool aAmplitude = theOptions.mUnits == "AMPLITUDE";
  SSimLines aLines(aGrid.mPixels);
  for (int32_t l = 0; l < aGrid.mLines; ++l) {
    aSampler.reflectivity(l, aLines.mReflectivity.data());
    aSampler.validity(l, aNoData, aLines.mValid.data());
    for (size_t p = 0; p < aLines.mRe.size(); ++p)
      speckle(aSpeckle, theOptions, aComplex, aAmplitude, aLines.mReflectivity[p], aLines.mRe[p], aLines.mIm[p]);
    aWriter.putLine(l, aLines.mRe.data(), aLines.mIm.data(), aLines.mValid.data());
  }
  aWriter.finish();
  report(aWriter);
}

// ------------------------------------------------------------------ pair

// The four outputs of a pair: two intensity (or amplitude) images and,
// optionally, the two complex images they are the power of.
struct SSimPairWriters {
  std::unique_ptr<CSimRasterWriter> mImage[2];
  std::unique_ptr<CSimRasterWriter> mSlc[2];
};

SSimPairWriters openPairWriters(const SSimOptions &theOptions) {
  SSimPairWriters aWriters;
  char aNote[200];
  for (int32_t k = 1; k <= 2; ++k) {
    std::snprintf(aNote, sizeof aNote, "tlrx_simulate pair image %d of 2, coherence %g to %g, seed %llu, looks %d", k,
                  theOptions.mCoherence0, theOptions.mCoherence1, static_cast<unsigned long long>(theOptions.mSeed),
                  theOptions.mLooks);
    aWriters.mImage[k - 1] = std::make_unique<CSimRasterWriter>(theOptions, imageSpec(theOptions, k, aNote));
    if (!theOptions.mSlc)
      continue;
    SSimImageSpec aSpec = imageSpec(theOptions, k, aNote);
    aSpec.mName = theOptions.mOut + "_slc_" + std::to_string(k);
    aSpec.mCellType = CTLRX_CELL_FLOAT_COMPLEX;
    aSpec.mUnits = "SLC";
    aWriters.mSlc[k - 1] = std::make_unique<CSimRasterWriter>(theOptions, aSpec);
  }
  return aWriters;
}

double coherenceAt(const SSimOptions &theOptions, int32_t thePixel, int32_t thePixels) {
  if (thePixels < 2)
    return theOptions.mCoherence0;
  return theOptions.mCoherence0 +
         (theOptions.mCoherence1 - theOptions.mCoherence0) * thePixel / static_cast<double>(thePixels - 1);
}

// One pixel of the pair, on a unit reflectivity. Per look: x1, x2
// independent unit circular complex Gaussians (parts of variance 1/2),
// z1 = x1, z2 = g x1 + sqrt(1 - g^2) x2; the powers are |z|^2 averaged over
// the looks, and z1, z2 of the last look are kept for the complex pair.
struct SSimPairDraw {
  double mPower1 = 0.0;
  double mPower2 = 0.0;
  std::complex<double> mZ1;
  std::complex<double> mZ2;
};

SSimPairDraw drawPair(CSimRandom &theRandom, double theCoherence, int32_t theLooks) {
  const double aHalf = std::sqrt(0.5);
  const double aRest = std::sqrt(1.0 - theCoherence * theCoherence);
  SSimPairDraw aDraw;
  for (int32_t aLook = 0; aLook < theLooks; ++aLook) {
    const double aRe1 = theRandom.normal(), aIm1 = theRandom.normal();
    const double aRe2 = theRandom.normal(), aIm2 = theRandom.normal();
    const std::complex<double> aX1(aHalf * aRe1, aHalf * aIm1);
    const std::complex<double> aX2(aHalf * aRe2, aHalf * aIm2);
    aDraw.mZ1 = aX1;
    aDraw.mZ2 = theCoherence * aX1 + aRest * aX2;
    aDraw.mPower1 += std::norm(aDraw.mZ1);
    aDraw.mPower2 += std::norm(aDraw.mZ2);
  }
  aDraw.mPower1 /= theLooks;
  aDraw.mPower2 /= theLooks;
  return aDraw;
}

} // namespace

void fdfSimWriteSeries(const SSimOptions &theOptions) {
  const CSimScene aScene(theOptions);
  std::vector<std::string> aNames;
  for (int32_t k = 1; k <= theOptions.mCount; ++k) {
    writeSeriesImage(theOptions, aScene, k);
    aNames.push_back(fdfSimImageName(theOptions, k));
  }
  writeList(theOptions, aNames);
}

// Intensities R |z|^2 of the pair draws; the complex images are sqrt(R) z,
// the second turned by -phi so that slc_1 x conj(slc_2) has phase phi.
void fdfSimWritePair(const SSimOptions &theOptions) {
  const CSimScene aScene(theOptions);
  SSimPairWriters aWriters = openPairWriters(theOptions);
  const SSimGrid aGrid = fdfSimImageGrid(theOptions, 1);
  // Both images see the same ground; each has its own no-data boxes.
  const CSimImageSampler aSampler1(aScene, theOptions, aGrid, 1);
  const CSimImageSampler aSampler2(aScene, theOptions, aGrid, 2);
  CSimRandom aRandom(fdfSimKey(theOptions.mSeed, CTLRX_SIM_STREAM_PAIR, 0));
  CSimRandom aNoData1(fdfSimKey(theOptions.mSeed, CTLRX_SIM_STREAM_NODATA, 1));
  CSimRandom aNoData2(fdfSimKey(theOptions.mSeed, CTLRX_SIM_STREAM_NODATA, 2));
  const bool aAmplitude = theOptions.mUnits == "AMPLITUDE";
  SSimLines aLines1(aGrid.mPixels), aLines2(aGrid.mPixels), aSlc1(aGrid.mPixels), aSlc2(aGrid.mPixels);
  for (int32_t l = 0; l < aGrid.mLines; ++l) {
    aSampler1.reflectivity(l, aLines1.mReflectivity.data());
    aSampler1.validity(l, aNoData1, aLines1.mValid.data());
    aSampler2.validity(l, aNoData2, aLines2.mValid.data());
    for (int32_t p = 0; p < aGrid.mPixels; ++p) {
      const size_t i = static_cast<size_t>(p);
      const SSimPairDraw aDraw = drawPair(aRandom, coherenceAt(theOptions, p, aGrid.mPixels), theOptions.mLooks);
      const double aR = aLines1.mReflectivity[i];
      aLines1.mRe[i] = aAmplitude ? std::sqrt(aR * aDraw.mPower1) : aR * aDraw.mPower1;
      aLines2.mRe[i] = aAmplitude ? std::sqrt(aR * aDraw.mPower2) : aR * aDraw.mPower2;
      if (!theOptions.mSlc)
        continue;
      const double aPhi = CTLRX_SIM_TWO_PI * (theOptions.mFringesPerLine * l + theOptions.mFringesPerPixel * p);
      const std::complex<double> aS1 = std::sqrt(aR) * aDraw.mZ1;
      const std::complex<double> aS2 = std::sqrt(aR) * aDraw.mZ2 * std::polar(1.0, -aPhi);
      aSlc1.mRe[i] = aS1.real();
      aSlc1.mIm[i] = aS1.imag();
      aSlc2.mRe[i] = aS2.real();
      aSlc2.mIm[i] = aS2.imag();
    }
    aWriters.mImage[0]->putLine(l, aLines1.mRe.data(), aLines1.mIm.data(), aLines1.mValid.data());
    aWriters.mImage[1]->putLine(l, aLines2.mRe.data(), aLines2.mIm.data(), aLines2.mValid.data());
    if (theOptions.mSlc) {
      aWriters.mSlc[0]->putLine(l, aSlc1.mRe.data(), aSlc1.mIm.data(), aLines1.mValid.data());
      aWriters.mSlc[1]->putLine(l, aSlc2.mRe.data(), aSlc2.mIm.data(), aLines2.mValid.data());
    }
  }
  for (const auto *aSet : {&aWriters.mImage, &aWriters.mSlc})
    for (const std::unique_ptr<CSimRasterWriter> &aWriter : *aSet)
      if (aWriter) {
        aWriter->finish();
        report(*aWriter);
      }
  writeList(theOptions, {fdfSimImageName(theOptions, 1), fdfSimImageName(theOptions, 2)});
}

void fdfSimWriteConstant(const SSimOptions &theOptions) {
  const CSimScene aScene(theOptions);
  char aNote[160];
  std::snprintf(aNote, sizeof aNote, "tlrx_simulate constant %.17g %.17g", theOptions.mValueRe, theOptions.mValueIm);
  CSimRasterWriter aWriter(theOptions, imageSpec(theOptions, 1, aNote));
  const SSimGrid &aGrid = aWriter.getSpec().mGrid;
  const CSimImageSampler aSampler(aScene, theOptions, aGrid, 1);
  CSimRandom aNoData(fdfSimKey(theOptions.mSeed, CTLRX_SIM_STREAM_NODATA, 1));
  SSimLines aLines(aGrid.mPixels);
  std::fill(aLines.mRe.begin(), aLines.mRe.end(), theOptions.mValueRe);
  std::fill(aLines.mIm.begin(), aLines.mIm.end(), theOptions.mValueIm);
  for (int32_t l = 0; l < aGrid.mLines; ++l) {
    aSampler.validity(l, aNoData, aLines.mValid.data());
    aWriter.putLine(l, aLines.mRe.data(), aLines.mIm.data(), aLines.mValid.data());
  }
  aWriter.finish();
  report(aWriter);
  writeList(theOptions, {theOptions.mOut});
}

void fdfSimRun(const SSimOptions &theOptions) {
  switch (theOptions.mCommand) {
  case CTLRX_SIM_SERIES: fdfSimWriteSeries(theOptions); break;
  case CTLRX_SIM_PAIR: fdfSimWritePair(theOptions); break;
  case CTLRX_SIM_SLC: fdfSimWriteSlcPair(theOptions); break;
  default: fdfSimWriteConstant(theOptions); break;
  }
}
