// Reflectivity and no-data masks of simulated images.
#include "tlrx_sim_scene.h"

#include <algorithm>
#include <cmath>

namespace {

constexpr double CTLRX_SIM_PI = 3.14159265358979323846;
constexpr double CTLRX_SIM_WAVE_DEPTH = 0.3;

int64_t cellOf(double theCoordinate) { return static_cast<int64_t>(std::floor(theCoordinate)); }

} // namespace

CSimScene::CSimScene(const SSimOptions &theOptions)
    : mOptions(theOptions), mWavelength(std::max(64.0, 8.0 * theOptions.mFieldSize)) {}

bool CSimScene::inFlatBox(int64_t theLine, int64_t thePixel) const {
  for (const SSimBox &aBox : mOptions.mFlatBoxes)
    if (aBox.contains(theLine, thePixel))
      return true;
  return false;
}

int64_t CSimScene::fieldOf(double theCoordinate) const { return cellOf(theCoordinate / mOptions.mFieldSize); }

double CSimScene::fieldLevel(int64_t theFieldY, int64_t theFieldX) const {
  const uint64_t aKey = fdfSimKey(mOptions.mSeed, CTLRX_SIM_STREAM_FIELDS, theFieldY, theFieldX);
  return std::pow(10.0, mOptions.mContrastDb * (fdfSimUnitFromKey(aKey) - 0.5) / 10.0);
}

double CSimScene::waveTerm(double theCoordinate) const {
  return std::sin(2.0 * CTLRX_SIM_PI * theCoordinate / mWavelength);
}

double CSimScene::wave(double theTermX, double theTermY) const {
  return 1.0 + CTLRX_SIM_WAVE_DEPTH * theTermX * theTermY;
}

CSimImageSampler::CSimImageSampler(const CSimScene &theScene, const SSimOptions &theOptions, const SSimGrid &theGrid,
                                   int32_t theImage)
    : mScene(theScene), mOptions(theOptions), mGrid(theGrid), mReference(fdfSimReferenceGrid(theOptions)),
      mImage(theImage) {
  const size_t aPixels = static_cast<size_t>(theGrid.mPixels);
  mSceneX.resize(aPixels);
  mCellX.resize(aPixels);
  mFieldX.resize(aPixels);
  mWaveX.resize(aPixels);
  for (size_t p = 0; p < aPixels; ++p) {
    const double aEast = mGrid.mX0 + (static_cast<double>(p) + 0.5) * mGrid.mSpacingX;
    mSceneX[p] = (aEast - mReference.mX0) / mReference.mSpacingX;
    mCellX[p] = cellOf(mSceneX[p]);
    mFieldX[p] = theScene.fieldOf(mSceneX[p]);
    mWaveX[p] = theScene.waveTerm(mSceneX[p]);
  }
  for (const SSimTrend &aTrend : theOptions.mTrends)
    mTrendFactors.push_back(std::pow(10.0, aTrend.mDbPerImage * (theImage - 1) / 10.0));
}

double CSimImageSampler::dateFactor(int64_t theLine, int64_t thePixel) const {
  double aFactor = 1.0;
  for (const SSimChange &aChange : mOptions.mChanges)
    if (mImage >= aChange.mImage && aChange.mBox.contains(theLine, thePixel))
      aFactor *= aChange.mFactor;
  for (size_t t = 0; t < mTrendFactors.size(); ++t)
    if (mOptions.mTrends[t].mBox.contains(theLine, thePixel))
      aFactor *= mTrendFactors[t];
  return aFactor;
}

double CSimImageSampler::sceneY(int32_t theLine) const {
  const double aNorth = mGrid.mY0 - (theLine + 0.5) * mGrid.mSpacingY;
  return (mReference.mY0 - aNorth) / mReference.mSpacingY;
}

void CSimImageSampler::reflectivity(int32_t theLine, double *theOut) const {
  const double aR = mOptions.mReflectivity;
  const double aY = sceneY(theLine);
  const int64_t aLine = cellOf(aY);
  const int64_t aFieldY = mScene.fieldOf(aY);
  const double aWaveY = mScene.waveTerm(aY);
  const bool aDated = !mOptions.mChanges.empty() || !mOptions.mTrends.empty();
  // Neighbouring pixels share their field: its level is drawn once per run of pixels.
  int64_t aLevelField = 0;
  double aLevel = -1.0;
  for (size_t p = 0; p < mSceneX.size(); ++p) {
    double aValue = aR;
    if (!mScene.isFlat() && !mScene.inFlatBox(aLine, mCellX[p])) {
      if (aLevel < 0.0 || mFieldX[p] != aLevelField) {
        aLevelField = mFieldX[p];
        aLevel = mScene.fieldLevel(aFieldY, aLevelField);
      }
      aValue = aR * aLevel * mScene.wave(mWaveX[p], aWaveY);
    }
    if (aDated)
      aValue *= dateFactor(aLine, mCellX[p]);
    theOut[p] = aValue;
  }
}

void CSimImageSampler::validity(int32_t theLine, CSimRandom &theRandom, uint8_t *theValid) const {
  const int64_t aLine = cellOf(sceneY(theLine));
  const double aFraction = mOptions.mNoDataFraction;
  for (int32_t p = 0; p < mGrid.mPixels; ++p) {
    bool aValid = true;
    if (aFraction > 0.0)
      aValid = theRandom.uniform() >= aFraction;
    const int64_t aPixel = mCellX[static_cast<size_t>(p)];
    for (const SSimNoDataBox &aBox : mOptions.mNoDataBoxes)
      if ((aBox.mImage == 0 || aBox.mImage == mImage) && aBox.mBox.contains(aLine, aPixel))
        aValid = false;
    theValid[p] = aValid ? 1 : 0;
  }
}
