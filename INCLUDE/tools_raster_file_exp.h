// Typed line access of the raster file: conversion of raw cells (machine
// order) to float or double with the no-data rule, scale factors, complex
// power or amplitude, and the caller's pixel order; complex lines as
// std::complex in both directions.
//
// No-data rule: tlrx_no_data.h; a complex cell is no data when both its parts
// are. No-data cells give D. The rule's interval is turned once per line into
// an interval of the cell's own type, so the per-cell test is two comparisons
// in that type and the loops stay vectorisable.
#pragma once

#include "tlrx_raster_file.h"

#include <algorithm>
#include <cmath>
#include <complex>
#include <cstring>
#include <limits>
#include <type_traits>

namespace tlrx_raster_detail {

struct SCellConversion {
  SNoData mNoData;
  double mRealScale;
  double mImaginaryScale;
  bool mScale;     // false when both factors are exactly 1.0
  bool mAmplitude; // complex cells: square root of the power
};

template <typename S>
inline S loadCell(const uint8_t *theCells, int64_t theIndex) {
  S aValue;
  std::memcpy(&aValue, theCells + theIndex * static_cast<int64_t>(sizeof(S)), sizeof(S));
  return aValue;
}

// Values of S whose double value lies in [mLow, mHigh]; empty as [1, 0].
template <typename S>
struct SInRange {
  S mLow;
  S mHigh;
  bool operator()(S theValue) const { return (theValue >= mLow) & (theValue <= mHigh); }
};

template <typename S>
struct SIsNaN {
  bool operator()(S theValue) const { return theValue != theValue; }
};

// Double to a floating type, saturating to infinity outside its range.
template <typename S>
inline S narrowFloating(double theValue) {
  if (std::isnan(theValue))
    return std::numeric_limits<S>::quiet_NaN();
  if (theValue > static_cast<double>(std::numeric_limits<S>::max()))
    return std::numeric_limits<S>::infinity();
  if (theValue < -static_cast<double>(std::numeric_limits<S>::max()))
    return -std::numeric_limits<S>::infinity();
  return static_cast<S>(theValue);
}

// The rule's interval [D - tol, D + tol] expressed in the cell type S.
template <typename S>
SInRange<S> nullInterval(const SNoData &theNoData) {
  const double aLow = theNoData.mLow;
  const double aHigh = theNoData.mHigh;
  if constexpr (std::is_floating_point_v<S>) {
    S aLowS = narrowFloating<S>(aLow);
    if (static_cast<double>(aLowS) < aLow)
      aLowS = std::nextafter(aLowS, std::numeric_limits<S>::infinity());
    S aHighS = narrowFloating<S>(aHigh);
    if (static_cast<double>(aHighS) > aHigh)
      aHighS = std::nextafter(aHighS, -std::numeric_limits<S>::infinity());
    return {aLowS, aHighS};
  } else {
    const double aFirst = std::ceil(aLow);
    const double aLast = std::floor(aHigh);
    const double aMin = static_cast<double>(std::numeric_limits<S>::min());
    const double aMax = static_cast<double>(std::numeric_limits<S>::max());
    if (theNoData.mNullIsNaN || aFirst > aLast || aFirst > aMax || aLast < aMin)
      return {S(1), S(0)};
    return {static_cast<S>(std::max(aFirst, aMin)), static_cast<S>(std::min(aLast, aMax))};
  }
}

template <typename T, typename S, typename P, bool kScale>
void convertRealLoop(T *__restrict theDest, const uint8_t *__restrict theCells, int32_t theCount, P theIsNull, T theNull,
                     double theScale) {
  for (int32_t i = 0; i < theCount; ++i) {
    const S aValue = loadCell<S>(theCells, i);
    const T aOut = kScale ? static_cast<T>(static_cast<double>(aValue) * theScale) : static_cast<T>(aValue);
    theDest[i] = theIsNull(aValue) ? theNull : aOut;
  }
}

template <typename T, typename S, typename P>
void convertRealCells(T *theDest, const uint8_t *theCells, int32_t theCount, P theIsNull,
                      const SCellConversion &theConv) {
  const T aNull = narrowFloating<T>(theConv.mNoData.mNull);
  if (theConv.mScale)
    convertRealLoop<T, S, P, true>(theDest, theCells, theCount, theIsNull, aNull, theConv.mRealScale);
  else
    convertRealLoop<T, S, P, false>(theDest, theCells, theCount, theIsNull, aNull, 1.0);
}

// Complex cell theIndex, the one read of complex cells: its parts times
// their scale factors into theRe and theIm; true when it is no data (both
// parts as stored are).
template <typename S, typename P>
inline bool loadComplexCell(const uint8_t *theCells, int32_t theIndex, P theIsNull, const SCellConversion &theConv,
                            double &theRe, double &theIm) {
  const S aRe = loadCell<S>(theCells, 2 * static_cast<int64_t>(theIndex));
  const S aIm = loadCell<S>(theCells, 2 * static_cast<int64_t>(theIndex) + 1);
  theRe = static_cast<double>(aRe) * theConv.mRealScale;
  theIm = static_cast<double>(aIm) * theConv.mImaginaryScale;
  return theIsNull(aRe) & theIsNull(aIm);
}

template <typename T, typename S, typename P>
void convertComplexCells(T *theDest, const uint8_t *theCells, int32_t theCount, P theIsNull,
                         const SCellConversion &theConv) {
  const T aNull = narrowFloating<T>(theConv.mNoData.mNull);
  for (int32_t i = 0; i < theCount; ++i) {
    double aReal, aImag;
    if (loadComplexCell<S>(theCells, i, theIsNull, theConv, aReal, aImag)) {
      theDest[i] = aNull;
      continue;
    }
    const double aPower = aReal * aReal + aImag * aImag;
    theDest[i] = static_cast<T>(theConv.mAmplitude ? std::sqrt(aPower) : aPower);
  }
}

// Calls theBody with the no-data test of cells of type S (NaN or interval),
// picked once per line.
template <typename S, typename F>
void withCellNullTest(const SNoData &theNoData, F &&theBody) {
  if (std::is_floating_point_v<S> && theNoData.mNullIsNaN)
    theBody(SIsNaN<S>());
  else
    theBody(nullInterval<S>(theNoData));
}

template <typename T, typename S>
void convertCells(T *theDest, const uint8_t *theCells, int32_t theCount, bool theComplex,
                  const SCellConversion &theConv) {
  withCellNullTest<S>(theConv.mNoData, [&](auto theIsNull) {
    if (theComplex)
      convertComplexCells<T, S>(theDest, theCells, theCount, theIsNull, theConv);
    else
      convertRealCells<T, S>(theDest, theCells, theCount, theIsNull, theConv);
  });
}

// BIT lines hold whole packed lines; theFirstPixel is the first column.
template <typename T>
void convertBits(T *theDest, const uint8_t *theLine, int32_t theFirstPixel, int32_t theCount,
                 const SCellConversion &theConv) {
  const SInRange<uint8_t> aRange = nullInterval<uint8_t>(theConv.mNoData);
  const T aNull = narrowFloating<T>(theConv.mNoData.mNull);
  const double aScale = theConv.mScale ? theConv.mRealScale : 1.0;
  for (int32_t i = 0; i < theCount; ++i) {
    const uint8_t aBit = static_cast<uint8_t>(fdfGetBit(theLine, static_cast<int64_t>(theFirstPixel) + i));
    theDest[i] = aRange(aBit) ? aNull : static_cast<T>(aBit * aScale);
  }
}

// False for an unknown cell type.
template <typename T>
bool convertLine(T *theDest, const uint8_t *theCells, int32_t theCellType, int32_t theFirstPixel, int32_t theCount,
                 const SCellConversion &theConv) {
  switch (theCellType) {
  case CTLRX_CELL_BYTE: convertCells<T, int8_t>(theDest, theCells, theCount, false, theConv); return true;
  case CTLRX_CELL_BYTE_COMPLEX: convertCells<T, int8_t>(theDest, theCells, theCount, true, theConv); return true;
  case CTLRX_CELL_UNSIGNED_BYTE: convertCells<T, uint8_t>(theDest, theCells, theCount, false, theConv); return true;
  case CTLRX_CELL_UBYTE_COMPLEX: convertCells<T, uint8_t>(theDest, theCells, theCount, true, theConv); return true;
  case CTLRX_CELL_SHORT: convertCells<T, int16_t>(theDest, theCells, theCount, false, theConv); return true;
  case CTLRX_CELL_UNSIGNED_SHORT: convertCells<T, uint16_t>(theDest, theCells, theCount, false, theConv); return true;
  case CTLRX_CELL_SHORT_COMPLEX: convertCells<T, int16_t>(theDest, theCells, theCount, true, theConv); return true;
  case CTLRX_CELL_FLOAT: convertCells<T, float>(theDest, theCells, theCount, false, theConv); return true;
  case CTLRX_CELL_FLOAT_COMPLEX: convertCells<T, float>(theDest, theCells, theCount, true, theConv); return true;
  case CTLRX_CELL_DOUBLE: convertCells<T, double>(theDest, theCells, theCount, false, theConv); return true;
  case CTLRX_CELL_DOUBLE_COMPLEX: convertCells<T, double>(theDest, theCells, theCount, true, theConv); return true;
  case CTLRX_CELL_UNSIGNED_INT: convertCells<T, uint32_t>(theDest, theCells, theCount, false, theConv); return true;
  case CTLRX_CELL_INT: convertCells<T, int32_t>(theDest, theCells, theCount, false, theConv); return true;
  case CTLRX_CELL_BIT: convertBits<T>(theDest, theCells, theFirstPixel, theCount, theConv); return true;
  case CTLRX_CELL_UNSIGNED_SHORT_COMPLEX:
    convertCells<T, uint16_t>(theDest, theCells, theCount, true, theConv);
    return true;
  default: return false;
  }
}

// ------------------------------------------------------------ complex lines

// Calls theBody with a value of the part type of a complex cell type; false
// for the other cell types.
template <typename F>
bool withComplexPart(int32_t theCellType, F &&theBody) {
  switch (theCellType) {
  case CTLRX_CELL_BYTE_COMPLEX: theBody(int8_t()); return true;
  case CTLRX_CELL_UBYTE_COMPLEX: theBody(uint8_t()); return true;
  case CTLRX_CELL_SHORT_COMPLEX: theBody(int16_t()); return true;
  case CTLRX_CELL_UNSIGNED_SHORT_COMPLEX: theBody(uint16_t()); return true;
  case CTLRX_CELL_FLOAT_COMPLEX: theBody(float()); return true;
  case CTLRX_CELL_DOUBLE_COMPLEX: theBody(double()); return true;
  default: return false;
  }
}

template <typename T, typename S, typename P>
void decodeComplexCells(std::complex<T> *theDest, uint8_t *theValid, const uint8_t *theCells, int32_t theCount,
                        P theIsNull, const SCellConversion &theConv) {
  const T aNull = narrowFloating<T>(theConv.mNoData.mNull);
  for (int32_t i = 0; i < theCount; ++i) {
    double aRe, aIm;
    const bool aNoData = loadComplexCell<S>(theCells, i, theIsNull, theConv, aRe, aIm);
    theDest[i] = aNoData ? std::complex<T>(aNull, aNull)
                         : std::complex<T>(narrowFloating<T>(aRe), narrowFloating<T>(aIm));
    if (theValid != nullptr)
      theValid[i] = aNoData ? 0 : 1;
  }
}

// One part as stored in S: rounded to the nearest integer and saturated
// (NaN, which no integer holds, as 0), or saturated to infinity for floats.
template <typename S>
S encodePart(double theValue) {
  if constexpr (std::is_floating_point_v<S>) {
    return narrowFloating<S>(theValue);
  } else {
    if (std::isnan(theValue))
      return S(0);
    const double aRounded = std::nearbyint(theValue);
    if (aRounded <= static_cast<double>(std::numeric_limits<S>::min()))
      return std::numeric_limits<S>::min();
    if (aRounded >= static_cast<double>(std::numeric_limits<S>::max()))
      return std::numeric_limits<S>::max();
    return static_cast<S>(aRounded);
  }
}

// A no-data value (both parts, by the rule) is stored as D in both parts;
// other parts divided by their scale factor. theReversed takes the source
// from its end.
template <typename T, typename S>
void encodeComplexCells(uint8_t *theCells, const std::complex<T> *theSource, int32_t theCount, bool theReversed,
                        const SCellConversion &theConv) {
  const S aNull = encodePart<S>(theConv.mNoData.mNull);
  for (int32_t i = 0; i < theCount; ++i) {
    const std::complex<T> &aValue = theSource[theReversed ? theCount - 1 - i : i];
    const double aRe = aValue.real();
    const double aIm = aValue.imag();
    S aPair[2] = {aNull, aNull};
    if (!theConv.mNoData.isNullPair(aRe, aIm)) {
      aPair[0] = encodePart<S>(aRe / theConv.mRealScale);
      aPair[1] = encodePart<S>(aIm / theConv.mImaginaryScale);
    }
    std::memcpy(theCells + sizeof aPair * static_cast<size_t>(i), aPair, sizeof aPair);
  }
}

} // namespace tlrx_raster_detail

template <typename T>
void CRasterFile::getLine(T *theDest, int32_t theRow, int32_t theColStart, int32_t theColEnd, bool theAmplitude) {
  static_assert(std::is_same_v<T, float> || std::is_same_v<T, double>, "getLine delivers float or double");
  int32_t aColStart = theColStart;
  int32_t aColEnd = theColEnd;
  const uint8_t *aCells = typedLineCells(theRow, aColStart, aColEnd);
  const int32_t aCount = aColEnd - aColStart + 1;
  const tlrx_raster_detail::SCellConversion aConv{getNoData(), mRealScaleFactor, mImaginaryScaleFactor, mScaleFactor,
                                                  theAmplitude};
  if (!tlrx_raster_detail::convertLine(theDest, aCells, mCellType, aColStart, aCount, aConv))
    failUnknownCellType();
  if (mPixelsReversed)
    std::reverse(theDest, theDest + aCount);
}

// Both instantiations are compiled once, with the raster file, where the
// conversion loops get the vectoriser's full cost model.
extern template void CRasterFile::getLine<float>(float *, int32_t, int32_t, int32_t, bool);
extern template void CRasterFile::getLine<double>(double *, int32_t, int32_t, int32_t, bool);

template <typename T>
void CRasterFile::getComplexLine(std::complex<T> *theDest, int32_t theRow, int32_t theColStart, int32_t theColEnd,
                                 uint8_t *theValid) {
  static_assert(std::is_same_v<T, float> || std::is_same_v<T, double>, "complex lines are of float or double");
  requireComplexCells();
  int32_t aColStart = theColStart;
  int32_t aColEnd = theColEnd;
  const uint8_t *aCells = typedLineCells(theRow, aColStart, aColEnd);
  const int32_t aCount = aColEnd - aColStart + 1;
  const tlrx_raster_detail::SCellConversion aConv{getNoData(), mRealScaleFactor, mImaginaryScaleFactor, mScaleFactor,
                                                  false};
  tlrx_raster_detail::withComplexPart(mCellType, [&](auto thePart) {
    using S = decltype(thePart);
    tlrx_raster_detail::withCellNullTest<S>(aConv.mNoData, [&](auto theIsNull) {
      tlrx_raster_detail::decodeComplexCells<T, S>(theDest, theValid, aCells, aCount, theIsNull, aConv);
    });
  });
  if (mPixelsReversed) {
    std::reverse(theDest, theDest + aCount);
    if (theValid != nullptr)
      std::reverse(theValid, theValid + aCount);
  }
}

template <typename T>
void CRasterFile::putComplexLine(int32_t theRow, const std::complex<T> *theSource) {
  static_assert(std::is_same_v<T, float> || std::is_same_v<T, double>, "complex lines are of float or double");
  requireComplexCells();
  checkWritable(1);
  const int32_t aFileRow = typedFileRow(theRow);
  uint8_t *aCells = lineBuffer();
  const tlrx_raster_detail::SCellConversion aConv{getNoData(), mRealScaleFactor, mImaginaryScaleFactor, mScaleFactor,
                                                  false};
  tlrx_raster_detail::withComplexPart(mCellType, [&](auto thePart) {
    using S = decltype(thePart);
    tlrx_raster_detail::encodeComplexCells<T, S>(aCells, theSource, mNrOfPixelsPerLine, mPixelsReversed, aConv);
  });
  putLine(aFileRow, aCells);
}

// Compiled once, with the raster file.
extern template void CRasterFile::getComplexLine<float>(std::complex<float> *, int32_t, int32_t, int32_t, uint8_t *);
extern template void CRasterFile::getComplexLine<double>(std::complex<double> *, int32_t, int32_t, int32_t,
                                                         uint8_t *);
extern template void CRasterFile::putComplexLine<float>(int32_t, const std::complex<float> *);
extern template void CRasterFile::putComplexLine<double>(int32_t, const std::complex<double> *);
