// Cell encoding, headers and line-by-line raster output of the simulator.
#include "tlrx_sim_writer.h"

#include "tlrx_description_xml.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"
#include "tlrx_sim_dates.h"
#include "tlrx_standard_header.h"

#include <cmath>
#include <cstring>
#include <limits>
#include <type_traits>

// ------------------------------------------------------------- encoding

CSimCellEncoder::CSimCellEncoder(int32_t theCellType, double theNull, double theScaleFactor)
    : mCellType(theCellType), mNull(theNull), mNoData(theNull), mScaleFactor(theScaleFactor) {}

size_t CSimCellEncoder::lineBytes(int32_t thePixels) const {
  return static_cast<size_t>(fdfCellLineBytes(mCellType, thePixels));
}

template <typename T>
T CSimCellEncoder::toCell(double theValue) {
  const double aScaled = theValue / mScaleFactor;
  constexpr double aLow = static_cast<double>(std::numeric_limits<T>::lowest());
  constexpr double aHigh = static_cast<double>(std::numeric_limits<T>::max());
  if constexpr (std::is_integral<T>::value) {
    if (std::isnan(aScaled)) {
      ++mClipped;
      return 0;
    }
  }
  const double aStored = std::is_integral<T>::value ? std::nearbyint(aScaled) : aScaled;
  if (aStored < aLow || aStored > aHigh) {
    ++mClipped;
    return static_cast<T>(aStored < aLow ? aLow : aHigh);
  }
  return static_cast<T>(aStored);
}

// The null value of an integer type is a whole number within its range
// (checked with the options), so null + 1 or null - 1 exists. For floating
// types the step is well beyond the no-data tolerance of the readers.
template <typename T>
T CSimCellEncoder::awayFromNull(T theCell) const {
  if (!mNoData.isNull(static_cast<double>(theCell)))
    return theCell;
  if (std::is_integral<T>::value)
    return mNull < static_cast<double>(std::numeric_limits<T>::max()) ? static_cast<T>(mNull + 1.0)
                                                                       : static_cast<T>(mNull - 1.0);
  const double aStep = std::fmax(std::fabs(mNull) * 1e-6, 1e-30);
  return static_cast<T>(mNull + aStep);
}

template <typename T>
void CSimCellEncoder::encodeReal(const double *theRe, const uint8_t *theValid, int32_t thePixels, T *theCells) {
  const T aNull = static_cast<T>(mNull);
  for (int32_t p = 0; p < thePixels; ++p)
    theCells[p] = theValid[p] != 0 ? awayFromNull(toCell<T>(theRe[p])) : aNull;
}

template <typename T, bool theUnsigned>
void CSimCellEncoder::encodeComplex(const double *theRe, const double *theIm, const uint8_t *theValid,
                                    int32_t thePixels, T *theCells) {
  using TPart = decltype(theCells->mRe);
  const TPart aNull = static_cast<TPart>(mNull);
  for (int32_t p = 0; p < thePixels; ++p) {
    T &aCell = theCells[p];
    if (theValid[p] == 0) {
      aCell.mRe = aNull;
      aCell.mIm = aNull;
      continue;
    }
    aCell.mRe = toCell<TPart>(theUnsigned ? std::fabs(theRe[p]) : theRe[p]);
    aCell.mIm = toCell<TPart>(theUnsigned ? std::fabs(theIm[p]) : theIm[p]);
    // A complex cell is no data only when both parts are.
    if (mNoData.isNull(static_cast<double>(aCell.mIm)))
      aCell.mRe = awayFromNull(aCell.mRe);
  }
}

void CSimCellEncoder::encode(const double *theRe, const double *theIm, const uint8_t *theValid, int32_t thePixels,
                             uint8_t *theCells) {
  switch (mCellType) {
  case CTLRX_CELL_BYTE: encodeReal(theRe, theValid, thePixels, reinterpret_cast<int8_t *>(theCells)); break;
  case CTLRX_CELL_UNSIGNED_BYTE: encodeReal(theRe, theValid, thePixels, theCells); break;
  case CTLRX_CELL_SHORT: encodeReal(theRe, theValid, thePixels, reinterpret_cast<int16_t *>(theCells)); break;
  case CTLRX_CELL_UNSIGNED_SHORT:
    encodeReal(theRe, theValid, thePixels, reinterpret_cast<uint16_t *>(theCells));
    break;
  case CTLRX_CELL_INT: encodeReal(theRe, theValid, thePixels, reinterpret_cast<int32_t *>(theCells)); break;
  case CTLRX_CELL_UNSIGNED_INT:
    encodeReal(theRe, theValid, thePixels, reinterpret_cast<uint32_t *>(theCells));
    break;
  case CTLRX_CELL_FLOAT: encodeReal(theRe, theValid, thePixels, reinterpret_cast<float *>(theCells)); break;
  case CTLRX_CELL_DOUBLE: encodeReal(theRe, theValid, thePixels, reinterpret_cast<double *>(theCells)); break;
  case CTLRX_CELL_BYTE_COMPLEX:
    encodeComplex<bcomplex, false>(theRe, theIm, theValid, thePixels, reinterpret_cast<bcomplex *>(theCells));
    break;
  case CTLRX_CELL_UBYTE_COMPLEX:
    encodeComplex<ubcomplex, true>(theRe, theIm, theValid, thePixels, reinterpret_cast<ubcomplex *>(theCells));
    break;
  case CTLRX_CELL_SHORT_COMPLEX:
    encodeComplex<scomplex, false>(theRe, theIm, theValid, thePixels, reinterpret_cast<scomplex *>(theCells));
    break;
  case CTLRX_CELL_UNSIGNED_SHORT_COMPLEX:
    encodeComplex<uscomplex, true>(theRe, theIm, theValid, thePixels, reinterpret_cast<uscomplex *>(theCells));
    break;
  case CTLRX_CELL_FLOAT_COMPLEX:
    encodeComplex<fcomplex, false>(theRe, theIm, theValid, thePixels, reinterpret_cast<fcomplex *>(theCells));
    break;
  case CTLRX_CELL_DOUBLE_COMPLEX:
    encodeComplex<dcomplex, false>(theRe, theIm, theValid, thePixels, reinterpret_cast<dcomplex *>(theCells));
    break;
  default:
    TLRX_RAISE_F(CTLRX_ERR_FILE_PARSE, "cell type %s cannot be simulated", fdfCellTypeName(mCellType));
  }
}

// ---------------------------------------------------------------- header

namespace {

void setText(CDescription &theHeader, const char *theKey, const std::string &theValue) {
  theHeader.getField(theKey).setString(theValue.c_str());
}
void setInteger(CDescription &theHeader, const char *theKey, int32_t theValue) {
  theHeader.getField(theKey).setInteger(theValue);
}
void setDouble(CDescription &theHeader, const char *theKey, double theValue) {
  theHeader.getField(theKey).setDouble(theValue);
}

void setMapGrid(const SSimOptions &theOptions, const SSimGrid &theGrid, CDescription &theHeader) {
  const bool aUtm = theOptions.mGeoKind == CTLRX_SIM_GEO_UTM;
  const char *aUnits = aUtm ? "Meters" : "Degrees";
  setText(theHeader, "RasterInfo.GeocodedImage", "OK");
  setText(theHeader, "CartographicSystem.State", aUtm ? "UTM-GLOBAL" : "GEO-GLOBAL");
  if (aUtm) {
    setInteger(theHeader, "CartographicSystem.Zone", theOptions.mZone);
    setText(theHeader, "CartographicSystem.Hemisphere", theOptions.mNorth ? "NORTH" : "SOUTH");
    setText(theHeader, "CartographicSystem.Projection", "UTM");
  }
  setText(theHeader, "CartographicSystem.Ellipsoid", "WGS84");
  setText(theHeader, "CartographicSystem.Datum", "WGS-84");
  setText(theHeader, "CartographicSystem.Units", aUnits);
  setDouble(theHeader, "RegistrationCoordinates.LonEasting", theGrid.mX0);
  setDouble(theHeader, "RegistrationCoordinates.LatNorthing", theGrid.mY0);
  setDouble(theHeader, "RegistrationCoordinates.PixelSpacingLonEast", theGrid.mSpacingX);
  // North-up grids: northing decreases from one line to the next.
  setDouble(theHeader, "RegistrationCoordinates.PixelSpacingLatNorth", -theGrid.mSpacingY);
  setText(theHeader, "RegistrationCoordinates.RegistrationUnits", aUnits);
}

} // namespace

void fdfSimBuildHeader(const SSimOptions &theOptions, const SSimImageSpec &theSpec, CDescription &theHeader) {
  fdfDeclareStandardHeader(theHeader);
  setInteger(theHeader, "RasterInfo.NrOfLinesPerImage", theSpec.mGrid.mLines);
  setInteger(theHeader, "RasterInfo.NrOfPixelsPerLine", theSpec.mGrid.mPixels);
  setText(theHeader, "RasterInfo.CellType", fdfCellTypeName(theSpec.mCellType));
  setText(theHeader, "RasterInfo.DataUnits", theSpec.mUnits);
  for (const char *aKey : {"RasterInfo.HeaderOffset", "RasterInfo.RowPrefix", "RasterInfo.RowSuffix",
                           "RasterInfo.FooterLen"})
    setInteger(theHeader, aKey, 0);
  setText(theHeader, "RasterInfo.BytesOrder", theOptions.mMSBF ? "MSBF" : "LSBF");
  setInteger(theHeader, "RasterInfo.NrOfChannels", 1);
  setDouble(theHeader, "RasterInfo.NullCellValue", theOptions.mNull);
  if (theOptions.mScaleFactor != 1.0) {
    setDouble(theHeader, "RasterInfo.RealScaleFactor", theOptions.mScaleFactor);
    setDouble(theHeader, "RasterInfo.ImaginaryScaleFactor", theOptions.mScaleFactor);
  }
  fdfStampOtherInfo(theHeader, "ACQUISITION TIME", fdfSimAcquisitionText(theSpec.mDate).c_str());
  if (!theSpec.mNote.empty())
    fdfStampOtherInfo(theHeader, "SIMULATION", theSpec.mNote.c_str());
  if (theOptions.mGeoKind != CTLRX_SIM_GEO_NONE)
    setMapGrid(theOptions, theSpec.mGrid, theHeader);
}

// ---------------------------------------------------------------- raster

CSimRasterWriter::CSimRasterWriter(const SSimOptions &theOptions, const SSimImageSpec &theSpec)
    : mSpec(theSpec), mEncoder(theSpec.mCellType, theOptions.mNull, theOptions.mScaleFactor),
      mCells(mEncoder.lineBytes(theSpec.mGrid.mPixels)) {
  fdfSimBuildHeader(theOptions, mSpec, mHeader);
  mFile.open_write(mSpec.mName.c_str(), mHeader);
}

void CSimRasterWriter::putLine(int32_t theLine, const double *theRe, const double *theIm, const uint8_t *theValid) {
  mEncoder.encode(theRe, theIm, theValid, mSpec.mGrid.mPixels, mCells.data());
  mFile.putLine(theLine, mCells.data());
}

// The header is written last, so a header on disk stands for a complete raster.
void CSimRasterWriter::finish() {
  mFile.close();
  fdfWriteStandardHeader(mSpec.mName.c_str(), mHeader, true);
}
