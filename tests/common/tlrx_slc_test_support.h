// Single-look complex data for the interferometric tests: simulated pairs
// read back, and band-limited complex speckle with known truth: a periodic
// scene of white circular Gaussian noise kept within 1 / (2 osr) of
// the band centre per axis (the azimuth band centred at theCentre cycles per
// line), and the same scene moved by a Fourier phase ramp, which is exact for
// band-limited data: truth(y, x) = scene(y + dy, x + dx).
#pragma once

#include "tlrx_errors.h"
#include "tlrx_fft.h"
#include "tlrx_raster_file.h"
#include "tlrx_test_support.h"

#include <gtest/gtest.h>

#include <cmath>
#include <complex>
#include <random>
#include <string>
#include <vector>

using TLRXTestImage = std::vector<TLRXComplex>; // lines x pixels, line after line

inline void tlrxSpeckle(int theLines, int thePixels, double theCentre, double theDx, double theDy, unsigned theSeed,
                        TLRXTestImage &theScene, TLRXTestImage &theTruth) {
  const auto aWrap = [](double theCycles) { return theCycles - std::floor(theCycles + 0.5); };
  std::mt19937 aRandom(theSeed);
  std::normal_distribution<float> aNormal;
  const size_t aCount = size_t(theLines) * size_t(thePixels);
  CFftBuffer aA(aCount), aB(aCount);
  for (size_t i = 0; i < aCount; ++i)
    aA[i] = TLRXComplex(aNormal(aRandom), aNormal(aRandom));
  fdfFftPlan(theLines, thePixels, ETLRXFftDirection::FORWARD).execute(aA.data());
  for (int r = 0; r < theLines; ++r)
    for (int c = 0; c < thePixels; ++c) {
      const double aFr = aWrap(double(r) / theLines - theCentre) + theCentre;
      const double aFc = aWrap(double(c) / thePixels);
      const size_t i = size_t(r) * size_t(thePixels) + size_t(c);
      const bool aIn = std::fabs(aFr - theCentre) <= 0.5 / 1.2 && std::fabs(aFc) <= 0.5 / 1.2;
      aA[i] = aIn ? aA[i] / float(std::sqrt(double(aCount))) : TLRXComplex(0, 0);
      aB[i] = aA[i] * TLRXComplex(std::polar(1.0, 2 * M_PI * (aFc * theDx + aFr * theDy)));
    }
  fdfFftPlan(theLines, thePixels, ETLRXFftDirection::INVERSE).execute(aA.data());
  fdfFftPlan(theLines, thePixels, ETLRXFftDirection::INVERSE).execute(aB.data());
  theScene.assign(aA.data(), aA.data() + aCount);
  theTruth.assign(aB.data(), aB.data() + aCount);
}

// |sum a conj(b)| / sqrt(sum |a|^2 sum |b|^2) over lines and pixels [theFrom,
// theTo) of two images of thePixels per line.
inline double tlrxCoherence(const TLRXTestImage &theA, const TLRXTestImage &theB, int thePixels, int theFrom,
                            int theTo) {
  std::complex<double> aCross = 0;
  double aA = 0, aB = 0;
  for (int r = theFrom; r < theTo; ++r)
    for (int c = theFrom; c < theTo; ++c) {
      const std::complex<double> a = theA[size_t(r) * size_t(thePixels) + size_t(c)],
                                 b = theB[size_t(r) * size_t(thePixels) + size_t(c)];
      aCross += a * std::conj(b);
      aA += std::norm(a);
      aB += std::norm(b);
    }
  return std::abs(aCross) / std::sqrt(aA * aB);
}

// tlrx_simulate slc --out theDir/theRoot with theOptions (ROOT_1 the master,
// ROOT_2 the slave); the root's path.
inline std::string tlrxSimulateSlc(const CTempDir &theDir, const std::string &theRoot,
                                   std::vector<std::string> theOptions) {
  theOptions.insert(theOptions.begin(), {"slc", "--out", theDir.file(theRoot)});
  const STLRXRun aRun = tlrxRun("tlrx_simulate", theOptions, theDir.path());
  EXPECT_EQ(aRun.mExitStatus, 0) << aRun.mOutput;
  return theDir.file(theRoot);
}

// The cells of a complex raster read through the raster file, with its size.
struct STLRXTestSlc {
  int mLines = 0, mPixels = 0;
  TLRXTestImage mCells;
  TLRXComplex at(int theLine, int thePixel) const { return mCells[size_t(theLine) * size_t(mPixels) + size_t(thePixel)]; }
};
inline STLRXTestSlc tlrxReadSlc(const std::string &theName) {
  CRasterFile aRaster;
  aRaster.open_read(theName.c_str());
  STLRXTestSlc aImage{aRaster.getNrOfLinesPerImage(), aRaster.getNrOfPixelsPerLine(), {}};
  aImage.mCells.resize(size_t(aImage.mLines) * size_t(aImage.mPixels));
  for (int l = 0; l < aImage.mLines; ++l)
    aRaster.getComplexLine(aImage.mCells.data() + size_t(l) * size_t(aImage.mPixels), l);
  aRaster.close();
  return aImage;
}

// Calls a step program with theArgs as its argv (theArgs[0] the program's
// name); what it returns.
inline int tlrxCallStep(int (*theProgram)(int, char **), std::vector<std::string> theArgs) {
  std::vector<char *> aArgv;
  for (std::string &aArg : theArgs)
    aArgv.push_back(aArg.data());
  return theProgram(static_cast<int>(aArgv.size()), aArgv.data());
}

// A call of a step that must fail: its arguments after the program's name,
// the code and the message it raises.
struct STLRXStepFailure {
  std::vector<std::string> mArgs;
  int32_t mCode;
  std::string mMessage;
};
// Each call raises its code and message and leaves no file theResult.
inline void tlrxExpectStepFailures(int (*theProgram)(int, char **), const std::vector<STLRXStepFailure> &theCases,
                                   const std::string &theResult) {
  for (const STLRXStepFailure &aCase : theCases) {
    std::vector<std::string> aArgs = aCase.mArgs;
    aArgs.insert(aArgs.begin(), "step");
    SCOPED_TRACE(aArgs.back());
    int32_t aCode = 0;
    std::string aMessage;
    try {
      tlrxCallStep(theProgram, aArgs);
    } catch (const CErrorExceptionManager &aError) {
      aCode = aError.mCode;
      aMessage = aError.mMessage;
    }
    EXPECT_EQ(aCode, aCase.mCode);
    EXPECT_EQ(aMessage, aCase.mMessage);
    EXPECT_FALSE(tlrxFileExists(theResult));
  }
}

