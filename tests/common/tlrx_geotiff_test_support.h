// Helpers of the GeoTIFF quick-look tests: small rasters written through
// the raster file with a standard header, and TIFF files read back with
// libtiff and libgeotiff.
#pragma once

#include "tlrx_description_section.h"
#include "tlrx_raster_file.h"
#include "tlrx_standard_header.h"

#include <geotiff/geotiff.h>
#include <geotiff/geotiffio.h>
#include <geotiff/xtiffio.h>
#include <tiffio.h>

#include <cmath>
#include <cstdint>
#include <string>
#include <vector>

// A standard header for rows x cols cells of theCellType in theUnits;
// theNull, when given, becomes "NullCellValue".
inline void tlrxGeoTiffHeader(CDescription &theHeader, int32_t theRows, int32_t theCols, const char *theCellType,
                              const char *theUnits, const double *theNull = nullptr) {
  fdfDeclareStandardHeader(theHeader);
  theHeader.getField("RasterInfo.NrOfLinesPerImage") = theRows;
  theHeader.getField("RasterInfo.NrOfPixelsPerLine") = theCols;
  theHeader.getField("RasterInfo.CellType") = theCellType;
  theHeader.getField("RasterInfo.DataUnits") = theUnits;
  theHeader.getField("RasterInfo.HeaderOffset") = 0;
  theHeader.getField("RasterInfo.RowPrefix") = 0;
  theHeader.getField("RasterInfo.RowSuffix") = 0;
  if (theNull != nullptr)
    theHeader.getField("RasterInfo.NullCellValue") = *theNull;
}

inline void tlrxGeoTiffUtm(CDescription &theHeader, int32_t theZone, const char *theHemisphere, double theEasting,
                           double theNorthing, double theColSpacing, double theRowSpacing) {
  theHeader.getField("RasterInfo.GeocodedImage") = "OK";
  theHeader.getField("CartographicSystem.State") = "UTM-GLOBAL";
  theHeader.getField("CartographicSystem.Zone") = theZone;
  theHeader.getField("CartographicSystem.Hemisphere") = theHemisphere;
  theHeader.getField("RegistrationCoordinates.LonEasting") = theEasting;
  theHeader.getField("RegistrationCoordinates.LatNorthing") = theNorthing;
  theHeader.getField("RegistrationCoordinates.PixelSpacingLonEast") = theColSpacing;
  theHeader.getField("RegistrationCoordinates.PixelSpacingLatNorth") = theRowSpacing;
}

inline void tlrxGeoTiffGeographic(CDescription &theHeader, double theLon, double theLat, double theLonSpacing,
                                  double theLatSpacing) {
  theHeader.getField("RasterInfo.GeocodedImage") = "OK";
  theHeader.getField("CartographicSystem.State") = "GEO-GLOBAL";
  theHeader.getField("RegistrationCoordinates.LonEasting") = theLon;
  theHeader.getField("RegistrationCoordinates.LatNorthing") = theLat;
  theHeader.getField("RegistrationCoordinates.PixelSpacingLonEast") = theLonSpacing;
  theHeader.getField("RegistrationCoordinates.PixelSpacingLatNorth") = theLatSpacing;
}

// Writes the header and the cells (machine order, whole image) of theName.
inline void tlrxWriteGeoTiffRaster(const std::string &theName, CDescription &theHeader, const void *theCells) {
  fdfWriteStandardHeader(theName.c_str(), theHeader, true);
  CRasterFile aRaster;
  aRaster.open_write(theName.c_str(), theHeader);
  aRaster.writeRecords(0, aRaster.getNrOfLinesPerImage(), theCells);
  aRaster.close();
}

inline void tlrxWriteFloatRaster(const std::string &theName, int32_t theRows, int32_t theCols,
                                 const std::vector<float> &theValues, const char *theUnits,
                                 const double *theNull = nullptr) {
  CDescription aHeader;
  tlrxGeoTiffHeader(aHeader, theRows, theCols, "FLOAT", theUnits, theNull);
  tlrxWriteGeoTiffRaster(theName, aHeader, theValues.data());
}

// What a TIFF reader sees of our quick-looks.
struct STLRXTiffImage {
  uint32_t mWidth = 0;
  uint32_t mLength = 0;
  uint32_t mRowsPerStrip = 0;
  uint16_t mPhotometric = 0;
  uint16_t mBitsPerSample = 0;
  std::string mSoftware;
  std::string mDocumentName;
  std::vector<uint8_t> mPixels; // row after row
  std::vector<uint16_t> mRed, mGreen, mBlue;
  std::vector<double> mTiePoint;
  std::vector<double> mPixelScale;

  uint8_t at(uint32_t theRow, uint32_t theCol) const { return mPixels[size_t(theRow) * mWidth + theCol]; }
};

inline STLRXTiffImage tlrxReadTiff(const std::string &thePath) {
  STLRXTiffImage aImage;
  TIFF *aTiff = XTIFFOpen(thePath.c_str(), "r");
  if (aTiff == nullptr)
    return aImage;
  TIFFGetField(aTiff, TIFFTAG_IMAGEWIDTH, &aImage.mWidth);
  TIFFGetField(aTiff, TIFFTAG_IMAGELENGTH, &aImage.mLength);
  TIFFGetField(aTiff, TIFFTAG_ROWSPERSTRIP, &aImage.mRowsPerStrip);
  TIFFGetField(aTiff, TIFFTAG_PHOTOMETRIC, &aImage.mPhotometric);
  TIFFGetField(aTiff, TIFFTAG_BITSPERSAMPLE, &aImage.mBitsPerSample);
  char *aText = nullptr;
  if (TIFFGetField(aTiff, TIFFTAG_SOFTWARE, &aText) && aText != nullptr)
    aImage.mSoftware = aText;
  if (TIFFGetField(aTiff, TIFFTAG_DOCUMENTNAME, &aText) && aText != nullptr)
    aImage.mDocumentName = aText;
  uint16_t *aRed = nullptr, *aGreen = nullptr, *aBlue = nullptr;
  if (TIFFGetField(aTiff, TIFFTAG_COLORMAP, &aRed, &aGreen, &aBlue)) {
    aImage.mRed.assign(aRed, aRed + 256);
    aImage.mGreen.assign(aGreen, aGreen + 256);
    aImage.mBlue.assign(aBlue, aBlue + 256);
  }
  uint32_t aCount = 0;
  double *aValues = nullptr;
  if (TIFFGetField(aTiff, TIFFTAG_GEOTIEPOINTS, &aCount, &aValues))
    aImage.mTiePoint.assign(aValues, aValues + aCount);
  if (TIFFGetField(aTiff, TIFFTAG_GEOPIXELSCALE, &aCount, &aValues))
    aImage.mPixelScale.assign(aValues, aValues + aCount);
  aImage.mPixels.resize(size_t(aImage.mWidth) * aImage.mLength);
  for (uint32_t r = 0; r < aImage.mLength; ++r)
    TIFFReadScanline(aTiff, aImage.mPixels.data() + size_t(r) * aImage.mWidth, r, 0);
  XTIFFClose(aTiff);
  return aImage;
}

// GeoTIFF keys as libgeotiff reads them: -1 / "" / NaN when absent.
struct STLRXGeoKeys {
  TIFF *mTiff = nullptr;
  GTIF *mGtif = nullptr;
  explicit STLRXGeoKeys(const std::string &thePath) : mTiff(XTIFFOpen(thePath.c_str(), "r")) {
    if (mTiff != nullptr)
      mGtif = GTIFNew(mTiff);
  }
  ~STLRXGeoKeys() {
    if (mGtif != nullptr)
      GTIFFree(mGtif);
    if (mTiff != nullptr)
      XTIFFClose(mTiff);
  }
  STLRXGeoKeys(const STLRXGeoKeys &) = delete;
  STLRXGeoKeys &operator=(const STLRXGeoKeys &) = delete;

  bool has(int theKey) const { return mGtif != nullptr && GTIFKeyInfo(mGtif, geokey_t(theKey), nullptr, nullptr) > 0; }
  int shortValue(int theKey) const {
    uint16_t aValue = 0;
    return mGtif != nullptr && GTIFKeyGet(mGtif, geokey_t(theKey), &aValue, 0, 1) == 1 ? aValue : -1;
  }
  double doubleValue(int theKey) const {
    double aValue = 0.0;
    tagtype_t aType = TYPE_UNKNOWN;
    if (mGtif == nullptr || GTIFKeyInfo(mGtif, geokey_t(theKey), nullptr, &aType) <= 0 || aType != TYPE_DOUBLE)
      return std::nan("");
    return GTIFKeyGet(mGtif, geokey_t(theKey), &aValue, 0, 1) == 1 ? aValue : std::nan("");
  }
  std::string text(int theKey) const {
    char aText[512] = "";
    tagtype_t aType = TYPE_UNKNOWN;
    if (mGtif == nullptr || GTIFKeyInfo(mGtif, geokey_t(theKey), nullptr, &aType) <= 0 || aType != TYPE_ASCII)
      return "";
    GTIFKeyGet(mGtif, geokey_t(theKey), aText, 0, sizeof aText);
    return aText;
  }
};
