// Scene of the simulator: the mean reflectivity of every ground position at
// every date, and the no-data pixels of each image. Positions are given in
// lines and pixels of the reference grid (the common --lines/--pixels grid at
// --origin/--spacing), so images with other extents or spacings see the same
// ground; for non-geocoded images the reference grid is the image grid.
#pragma once

#include <cstdint>
#include <vector>

#include "tlrx_sim_options.h"
#include "tlrx_sim_random.h"

// Reflectivity model: R everywhere (flat), or square fields of random level
// (spread --contrast-db around R) times a smooth wave of +-30%; flat boxes hold
// exactly R; changes and trends multiply the result per image (applied by the
// image sampler).
class CSimScene {
public:
  explicit CSimScene(const SSimOptions &theOptions);

  // Parts of the reflectivity at scene position (x, y) (continuous,
  // reference pixels; the cell is the integer part), evaluated separately
  // so that an image computes the column parts once:
  // R x fieldLevel(field of x, field of y) x (1 + depth sin(x) sin(y)).
  bool isFlat() const { return mOptions.mFlatScene; }
  bool inFlatBox(int64_t theLine, int64_t thePixel) const;
  int64_t fieldOf(double theCoordinate) const;
  double fieldLevel(int64_t theFieldY, int64_t theFieldX) const;
  double waveTerm(double theCoordinate) const;
  double wave(double theTermX, double theTermY) const;

private:
  const SSimOptions &mOptions;
  double mWavelength;
};

// One image's view of the scene: the scene position of every pixel centre of
// its grid, computed once, then one line at a time.
class CSimImageSampler {
public:
  CSimImageSampler(const CSimScene &theScene, const SSimOptions &theOptions, const SSimGrid &theGrid,
                   int32_t theImage);

  // Reflectivity of the pixels of line theLine.
  void reflectivity(int32_t theLine, double *theOut) const;
  // 1 for valid pixels, 0 for no data. With a no-data fraction one uniform
  // is drawn for every pixel, boxes or not, so the draws never shift.
  void validity(int32_t theLine, CSimRandom &theRandom, uint8_t *theValid) const;

private:
  double sceneY(int32_t theLine) const;
  // Factor of the changes and trends of this image at a cell.
  double dateFactor(int64_t theLine, int64_t thePixel) const;

  const CSimScene &mScene;
  const SSimOptions &mOptions;
  SSimGrid mGrid;
  SSimGrid mReference;
  int32_t mImage;
  std::vector<double> mSceneX;
  std::vector<int64_t> mCellX;
  std::vector<int64_t> mFieldX;
  std::vector<double> mWaveX;
  std::vector<double> mTrendFactors; // per trend, its factor at this image
};
