// Slow, obviously right references for the window measures: every window is
// summed directly, in double precision, from the image in memory.
#pragma once

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <functional>
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

// theVisit(line, pixel) for every pixel of the window of output (l, j): lines
// l + R/2 - R + 1 .. l + R/2 and columns j - K/2 .. j + K/2, clipped.
inline void refForWindow(int theLines, int thePixels, int theRows, int theCols, int theLine, int thePixel,
                         const std::function<void(int, int)> &theVisit) {
  for (int y = std::max(0, theLine + theRows / 2 - theRows + 1); y <= std::min(theLines - 1, theLine + theRows / 2);
       ++y)
    for (int x = std::max(0, thePixel - theCols / 2); x <= std::min(thePixels - 1, thePixel + theCols / 2); ++x)
      theVisit(y, x);
}

// The same for the exact window: lines l - R/2 .. l - R/2 + R - 1, columns
// j - K/2 .. j - K/2 + K - 1; false for a border pixel (within R/2 lines or
// K/2 columns of an edge), whose output is the null value.
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
  for (int l = 0; l < theImage.mLines; ++l)
    for (int j = 0; j < theImage.mPixels; ++j) {
      std::vector<double> aSample;
      refForWindow(theImage.mLines, theImage.mPixels, theRows, theCols, l, j, [&](int y, int x) {
        if (theImage.valid(y, x))
          aSample.push_back(thePower ? std::sqrt(std::fabs(theImage.at(y, x))) : theImage.at(y, x));
      });
      double aMean = 0, aSquares = 0;
      for (double v : aSample)
        aMean += v / aSample.size();
      for (double v : aSample)
        aSquares += (v - aMean) * (v - aMean) / aSample.size();
      aOut.push_back(theImage.valid(l, j) && !aSample.empty() && aMean > 0 ? std::sqrt(aSquares) / aMean : theNull);
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
        aSumA += theA.valid(y, x) ? refIntensity(theA.at(y, x), thePowerA) : 0.0;
        aCountA += theA.valid(y, x) ? 1 : 0;
        aSumB += theB.valid(y, x) ? refIntensity(theB.at(y, x), thePowerB) : 0.0;
        aCountB += theB.valid(y, x) ? 1 : 0;
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
      const double aR = aX / std::sqrt(aAA * aBB);
      aOut.push_back(!aCounts(l, j) || !(aAA * aBB > 0) ? theNull : aR > 0.5 ? std::sqrt(2 * aR - 1) : 0.0);
    }
  return aOut;
}

// A theLines x thePixels image of theValue, every pixel valid.
inline STestImage constantImage(int theLines, int thePixels, double theValue) {
  STestImage aImage{theLines, thePixels, std::vector<double>(static_cast<size_t>(theLines) * thePixels, theValue), {}};
  aImage.mValid.assign(aImage.mValues.size(), 1);
  return aImage;
}

// Seeded uniform values in [theLow, theHigh), no data at theNoData (indices
// past the image are ignored, so one list serves images of several sizes).
inline STestImage randomImage(int theLines, int thePixels, uint64_t theSeed, double theLow, double theHigh,
                              const std::vector<int> &theNoData) {
  STestImage aImage = constantImage(theLines, thePixels, 0.0);
  std::mt19937_64 aEngine(theSeed);
  std::uniform_real_distribution<double> aValue(theLow, theHigh);
  for (double &aCell : aImage.mValues)
    aCell = aValue(aEngine);
  for (int aIndex : theNoData)
    if (aIndex >= 0 && static_cast<size_t>(aIndex) < aImage.mValid.size())
      aImage.mValid[static_cast<size_t>(aIndex)] = 0;
  return aImage;
}

// No-data pixels of a 7 x 9 image: corners, edges, the first pixel of
// several lines and inside.
inline std::vector<int> sevenByNineNoData() { return {0, 8, 9, 18, 22, 31, 32, 40, 54, 62}; }
