// Lines of a raster as the values of a GeoTIFF quick-look's stretch.
#include "tlrx_geotiff_source.h"

#include "tlrx_cell_types.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"
#include "tlrx_raster_file.h"
#include "tlrx_raster_to_geotiff.h"

#include <cmath>
#include <cstring>

namespace {

template <typename S>
void loadParts(const uint8_t *theCells, int32_t theCount, double *theRe, double *theIm) {
  for (int32_t i = 0; i < theCount; ++i) {
    S aPair[2];
    std::memcpy(aPair, theCells + 2 * sizeof(S) * static_cast<size_t>(i), sizeof aPair);
    theRe[i] = static_cast<double>(aPair[0]);
    theIm[i] = static_cast<double>(aPair[1]);
  }
}

bool loadComplexCells(int32_t theCellType, const uint8_t *theCells, int32_t theCount, double *theRe, double *theIm) {
  switch (theCellType) {
  case CTLRX_CELL_BYTE_COMPLEX: loadParts<int8_t>(theCells, theCount, theRe, theIm); return true;
  case CTLRX_CELL_UBYTE_COMPLEX: loadParts<uint8_t>(theCells, theCount, theRe, theIm); return true;
  case CTLRX_CELL_SHORT_COMPLEX: loadParts<int16_t>(theCells, theCount, theRe, theIm); return true;
  case CTLRX_CELL_UNSIGNED_SHORT_COMPLEX: loadParts<uint16_t>(theCells, theCount, theRe, theIm); return true;
  case CTLRX_CELL_FLOAT_COMPLEX: loadParts<float>(theCells, theCount, theRe, theIm); return true;
  case CTLRX_CELL_DOUBLE_COMPLEX: loadParts<double>(theCells, theCount, theRe, theIm); return true;
  default: return false;
  }
}

} // namespace

CTiffLineSource::CTiffLineSource(CRasterFile &theRaster, ETLRXTiffFamily theFamily, double theReScale,
                                 double theImScale)
    : mRaster(theRaster), mFamily(theFamily), mComplex(fdfIsComplexCellType(theRaster.getCellType())),
      mNull(theRaster.getDummyVal()), mReScale(theReScale), mImScale(theImScale) {
  const size_t aPixels = static_cast<size_t>(theRaster.getNrOfPixelsPerLine());
  mValues.resize(aPixels);
  mValid.resize(aPixels);
  if (mComplex) {
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
  for (int32_t i = 0; i < theCount; ++i)
    mValid[i] = std::isfinite(mValues[i]) && !fdfIsNull(mValues[i], mNull) ? 1 : 0;
}

void CTiffLineSource::readComplex(int32_t theRow, int32_t theColStart, int32_t theColEnd, int32_t theCount) {
  const uint8_t *aCells = static_cast<const uint8_t *>(mRaster.getLineBuffer(theRow, theColStart, theColEnd));
  if (!loadComplexCells(mRaster.getCellType(), aCells, theCount, mRe.data(), mIm.data()))
    TLRX_RAISE_F(CTLRX_ERR_TIFF_RASTER_OPEN, "Wrong CRasterFile Status %s", mRaster.getFileName());
  for (int32_t i = 0; i < theCount; ++i) {
    const bool aNull = fdfIsNull(mRe[i], mNull) && fdfIsNull(mIm[i], mNull);
    mRe[i] *= mReScale;
    mIm[i] *= mImScale;
    mValid[i] = !aNull && std::isfinite(mRe[i]) && std::isfinite(mIm[i]) ? 1 : 0;
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
