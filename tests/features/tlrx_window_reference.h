// Slow, obviously right references for the window measures: every window is
// summed directly, in double precision, from the image in memory. Plus
// seeded speckle generators for the statistical tests.
#pragma once

#include <algorithm>
#include <cmath>
#include <complex>
#include <cstdint>
#include <functional>
#include <limits>
#include <random>
#include <vector>

// An image in memory: values line after line and a validity flag per pixel.
struct STestImage {
  int mLines = 0;
  int mPixels = 0;
  std::vector<double> mValues;
  std::vector<int> mValid;
  double at(int theLine, int thePixel) const { return mValues[static_cast<size_t>(theLine) * mPixels + thePixel]; }
  bool valid(int theLine, int thePixel) const {
    return mValid[static_cast<size_t>(theLine) * mPixels + thePixel] != 0 && std::isfinite(at(theLine, thePixel));
  }
};

// Window of output (l, j): lines l + R/2 - R + 1 .. l + R/2 and columns
// j - K/2 .. j + K/2, both clipped to the image. theVisit(line, pixel) is
// called for every pixel of it.
inline void refForWindow(int theLines, int thePixels, int theRows, int theCols, int theLine, int thePixel,
                         const std::function<void(int, int)> &theVisit) {
  const int aFirst = std::max(0, theLine + theRows / 2 - theRows + 1);
  const int aLast = std::min(theLines - 1, theLine + theRows / 2);
  const int aLeft = std::max(0, thePixel - theCols / 2);
  const int aRight = std::min(thePixels - 1, thePixel + theCols / 2);
  for (int y = aFirst; y <= aLast; ++y)
    for (int x = aLeft; x <= aRight; ++x)
      theVisit(y, x);
}

// Exact window of output (l, j): lines l - R/2 .. l - R/2 + R - 1 and columns
// j - K/2 .. j - K/2 + K - 1. False for a border pixel (within R/2 lines or
// K/2 columns of an edge), whose output is the null value; otherwise
// theVisit(line, pixel) for every pixel of the window.
inline bool refForExactWindow(int theLines, int thePixels, int theRows, int theCols, int theLine, int thePixel,
                              const std::function<void(int, int)> &theVisit) {
  const int aHalfRows = theRows / 2, aHalfCols = theCols / 2;
  if (theLine < aHalfRows || theLine >= theLines - aHalfRows || thePixel < aHalfCols ||
      thePixel >= thePixels - aHalfCols)
    return false;
  for (int y = theLine - aHalfRows; y < theLine - aHalfRows + theRows; ++y)
    for (int x = thePixel - aHalfCols; x < thePixel - aHalfCols + theCols; ++x)
      theVisit(y, x);
  return true;
}

// Texture: coefficient of variation of the valid amplitudes, two-pass.
inline std::vector<double> refTexture(const STestImage &theImage, bool thePower, int theRows, int theCols,
                                      double theNull) {
  std::vector<double> aOut;
  auto aAmplitude = [&](int y, int x) {
    return thePower ? std::sqrt(std::fabs(theImage.at(y, x))) : theImage.at(y, x);
  };
  for (int l = 0; l < theImage.mLines; ++l)
    for (int j = 0; j < theImage.mPixels; ++j) {
      std::vector<double> aSample;
      refForWindow(theImage.mLines, theImage.mPixels, theRows, theCols, l, j, [&](int y, int x) {
        if (theImage.valid(y, x))
          aSample.push_back(aAmplitude(y, x));
      });
      double aSum = 0;
      for (double v : aSample)
        aSum += v;
      if (!theImage.valid(l, j) || aSample.empty() || !(aSum > 0)) {
        aOut.push_back(theNull);
        continue;
      }
      const double aMean = aSum / aSample.size();
      double aSquares = 0;
      for (double v : aSample)
        aSquares += (v - aMean) * (v - aMean);
      aOut.push_back(std::sqrt(aSquares / aSample.size()) / aMean);
    }
  return aOut;
}

inline double refIntensity(double theValue, bool thePower) { return thePower ? theValue : theValue * theValue; }

// Normalisation: mean of the two local mean intensities.
inline std::vector<double> refNormalize(const STestImage &theA, bool thePowerA, const STestImage &theB,
                                        bool thePowerB, int theRows, int theCols, double theNull) {
  std::vector<double> aOut;
  for (int l = 0; l < theA.mLines; ++l)
    for (int j = 0; j < theA.mPixels; ++j) {
      double aSumA = 0, aSumB = 0;
      int aCountA = 0, aCountB = 0;
      refForWindow(theA.mLines, theA.mPixels, theRows, theCols, l, j, [&](int y, int x) {
        if (theA.valid(y, x)) {
          aSumA += refIntensity(theA.at(y, x), thePowerA);
          ++aCountA;
        }
        if (theB.valid(y, x)) {
          aSumB += refIntensity(theB.at(y, x), thePowerB);
          ++aCountB;
        }
      });
      const bool aDefined = theA.valid(l, j) && theB.valid(l, j) && aCountA > 0 && aCountB > 0;
      aOut.push_back(aDefined ? (aSumA / aCountA + aSumB / aCountB) / 2 : theNull);
    }
  return aOut;
}

// Intensity coherence from normalised intensities, over the pixels where both
// inputs and the normalisation value are valid (and the latter not 0).
inline std::vector<double> refCoherence(const STestImage &theA, bool thePowerA, const STestImage &theB,
                                        bool thePowerB, const STestImage &theNorm, int theRows, int theCols,
                                        double theNull) {
  auto aCounts = [&](int y, int x) {
    return theA.valid(y, x) && theB.valid(y, x) && theNorm.valid(y, x) && theNorm.at(y, x) != 0.0;
  };
  std::vector<double> aOut;
  for (int l = 0; l < theA.mLines; ++l)
    for (int j = 0; j < theA.mPixels; ++j) {
      double aX = 0, aAA = 0, aBB = 0;
      refForWindow(theA.mLines, theA.mPixels, theRows, theCols, l, j, [&](int y, int x) {
        if (!aCounts(y, x))
          return;
        const double aX1 = refIntensity(theA.at(y, x), thePowerA) / theNorm.at(y, x);
        const double aX2 = refIntensity(theB.at(y, x), thePowerB) / theNorm.at(y, x);
        aX += aX1 * aX2;
        aAA += aX1 * aX1;
        aBB += aX2 * aX2;
      });
      if (!aCounts(l, j) || !(aAA * aBB > 0)) {
        aOut.push_back(theNull);
        continue;
      }
      const double aR = aX / std::sqrt(aAA * aBB);
      aOut.push_back(aR > 0.5 ? std::sqrt(2 * aR - 1) : 0.0);
    }
  return aOut;
}

// Seeded random pairs of single-look intensities of coherence theGamma, from
// circular Gaussian fields s2 = gamma s1 + sqrt(1 - gamma^2) n.
class CTestSpeckle {
public:
  explicit CTestSpeckle(uint64_t theSeed) : mEngine(theSeed) {}
  std::complex<double> circular() {
    std::normal_distribution<double> aNormal(0.0, std::sqrt(0.5));
    const double aRe = aNormal(mEngine);
    return {aRe, aNormal(mEngine)};
  }
  // Intensities of a pair of single-look pixels with coherence theGamma.
  void pair(double theGamma, double &theI1, double &theI2) {
    const std::complex<double> aS1 = circular();
    const std::complex<double> aS2 = theGamma * aS1 + std::sqrt(1 - theGamma * theGamma) * circular();
    theI1 = std::norm(aS1);
    theI2 = std::norm(aS2);
  }

private:
  std::mt19937_64 mEngine;
};
