// Lines of a raster as the values a GeoTIFF quick-look stretches: the cell
// value of real cells (scale factor applied by the raster file); for complex
// cells the amplitude, the intensity (intensity units) or the phase (phase
// and interferogram units), with their real and imaginary parts (scaled by
// the raster file) kept for the statistics. No-data cells (by the raster
// rule; both parts for complex cells) and cells that are not finite are
// marked invalid.
#pragma once

#include <complex>
#include <cstdint>
#include <vector>

#include "tlrx_geotiff_stretch.h"

class CRasterFile;

class CTiffLineSource {
public:
  CTiffLineSource(CRasterFile &theRaster, ETLRXTiffFamily theFamily);

  // Columns theColStart..theColEnd of file line theRow into values() and
  // valid() (and re(), im() for complex cells), from index 0.
  void read(int32_t theRow, int32_t theColStart, int32_t theColEnd);

  bool isComplex() const { return mComplex; }
  const double *values() const { return mValues.data(); }
  const uint8_t *valid() const { return mValid.data(); }
  const double *re() const { return mRe.data(); }
  const double *im() const { return mIm.data(); }

private:
  void readReal(int32_t theRow, int32_t theColStart, int32_t theColEnd, int32_t theCount);
  void readComplex(int32_t theRow, int32_t theColStart, int32_t theColEnd, int32_t theCount);
  double complexValue(double theRe, double theIm) const;

  CRasterFile &mRaster;
  ETLRXTiffFamily mFamily;
  bool mComplex;
  std::vector<std::complex<double>> mCells;
  std::vector<double> mValues;
  std::vector<uint8_t> mValid;
  std::vector<double> mRe;
  std::vector<double> mIm;
};
