// Lines of a raster as the values of a GeoTIFF quick-look's stretch.
#include "tlrx_geotiff_source.h"

#include "tlrx_cell_types.h"
#include "tlrx_raster_file.h"

#include <cmath>

CTiffLineSource::CTiffLineSource(CRasterFile &theRaster, ETLRXTiffFamily theFamily)
    : mRaster(theRaster), mFamily(theFamily), mComplex(fdfIsComplexCellType(theRaster.getCellType())) {
  const size_t aPixels = static_cast<size_t>(theRaster.getNrOfPixelsPerLine());
  mValues.resize(aPixels);
  mValid.resize(aPixels);
  if (mComplex) {
    mCells.resize(aPixels);
    mRe.resize(aPixels);
    mIm.resize(aPixels);
  }
}

void CTiffLineSource::read(int32_t theRow, int32_t theColStart, int32_t theColEnd) {
  const int32_t aCount = theColEnd - theColStart + 1;
  if (mComplex)
    readComplex(theRow, theColStart, theColEnd, aCount);
  else
    readReal(theRow, theColStart, theColEnd, aCount);
}

void CTiffLineSource::readReal(int32_t theRow, int32_t theColStart, int32_t theColEnd, int32_t theCount) {
  mRaster.getLine<double>(mValues.data(), theRow, theColStart, theColEnd);
  const SNoData aNoData = mRaster.getNoData();
  for (int32_t i = 0; i < theCount; ++i)
    mValid[i] = std::isfinite(mValues[i]) && !aNoData.isNull(mValues[i]) ? 1 : 0;
}

void CTiffLineSource::readComplex(int32_t theRow, int32_t theColStart, int32_t theColEnd, int32_t theCount) {
  mRaster.getComplexLine(mCells.data(), theRow, theColStart, theColEnd, mValid.data());
  for (int32_t i = 0; i < theCount; ++i) {
    mRe[i] = mCells[i].real();
    mIm[i] = mCells[i].imag();
    mValid[i] = mValid[i] != 0 && std::isfinite(mRe[i]) && std::isfinite(mIm[i]) ? 1 : 0;
    mValues[i] = complexValue(mRe[i], mIm[i]);
  }
}

double CTiffLineSource::complexValue(double theRe, double theIm) const {
  switch (mFamily) {
  case ETLRXTiffFamily::kInterferogram:
  case ETLRXTiffFamily::kPhase: return std::atan2(theIm, theRe);
  case ETLRXTiffFamily::kIntensity: return theRe * theRe + theIm * theIm;
  default: return std::hypot(theRe, theIm);
  }
}
