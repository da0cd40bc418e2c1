// Typed line access of the raster file: conversion of raw cells (machine
// order) to float or double with the no-data rule, scale factors, complex
// power or amplitude, and the caller's pixel order.
//
// No-data rule: a cell value v counts as no data when D - tol <= v <= D + tol
// (tol = CTLRX_RF_NULL_TOLERANCE), or when D is NaN and v is NaN; a complex
// cell when both its parts do. No-data cells give D. The interval is turned
// once per line into an interval of the cell's own type, so the per-cell test
// is two comparisons in that type and the loops stay vectorisable.
#pragma once

#include "tlrx_raster_file.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <limits>
#include <type_traits>

namespace tlrx_raster_detail {

struct SCellConversion {
  double mNull;
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

// The no-data interval [D - tol, D + tol] expressed in the cell type S.
template <typename S>
SInRange<S> nullInterval(double theNull) {
  const double aLow = theNull - CTLRX_RF_NULL_TOLERANCE;
  const double aHigh = theNull + CTLRX_RF_NULL_TOLERANCE;
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
    if (std::isnan(theNull) || aFirst > aLast || aFirst > aMax || aLast < aMin)
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
  const T aNull = narrowFloating<T>(theConv.mNull);
  if (theConv.mScale)
    convertRealLoop<T, S, P, true>(theDest, theCells, theCount, theIsNull, aNull, theConv.mRealScale);
  else
    convertRealLoop<T, S, P, false>(theDest, theCells, theCount, theIsNull, aNull, 1.0);
}

template <typename T, typename S, typename P>
void convertComplexCells(T *theDest, const uint8_t *theCells, int32_t theCount, P theIsNull,
                         const SCellConversion &theConv) {
  const T aNull = narrowFloating<T>(theConv.mNull);
  for (int32_t i = 0; i < theCount; ++i) {
    const S aRe = loadCell<S>(theCells, 2 * static_cast<int64_t>(i));
    const S aIm = loadCell<S>(theCells, 2 * static_cast<int64_t>(i) + 1);
    if (theIsNull(aRe) && theIsNull(aIm)) {
      theDest[i] = aNull;
      continue;
    }
    const double aReal = static_cast<double>(aRe) * theConv.mRealScale;
    const double aImag = static_cast<double>(aIm) * theConv.mImaginaryScale;
    const double aPower = aReal * aReal + aImag * aImag;
    theDest[i] = static_cast<T>(theConv.mAmplitude ? std::sqrt(aPower) : aPower);
  }
}

// Picks the no-data test (NaN or interval) once per line.
template <typename T, typename S>
void convertCells(T *theDest, const uint8_t *theCells, int32_t theCount, bool theComplex,
                  const SCellConversion &theConv) {
  if (std::is_floating_point_v<S> && std::isnan(theConv.mNull)) {
    if (theComplex)
      convertComplexCells<T, S>(theDest, theCells, theCount, SIsNaN<S>(), theConv);
    else
      convertRealCells<T, S>(theDest, theCells, theCount, SIsNaN<S>(), theConv);
    return;
  }
  const SInRange<S> aRange = nullInterval<S>(theConv.mNull);
  if (theComplex)
    convertComplexCells<T, S>(theDest, theCells, theCount, aRange, theConv);
  else
    convertRealCells<T, S>(theDest, theCells, theCount, aRange, theConv);
}

// BIT lines hold whole packed lines; theFirstPixel is the first column.
template <typename T>
void convertBits(T *theDest, const uint8_t *theLine, int32_t theFirstPixel, int32_t theCount,
                 const SCellConversion &theConv) {
  const SInRange<uint8_t> aRange = nullInterval<uint8_t>(theConv.mNull);
  const T aNull = narrowFloating<T>(theConv.mNull);
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

} // namespace tlrx_raster_detail

template <typename T>
void CRasterFile::getLine(T *theDest, int32_t theRow, int32_t theColStart, int32_t theColEnd, bool theAmplitude) {
  static_assert(std::is_same_v<T, float> || std::is_same_v<T, double>, "getLine delivers float or double");
  int32_t aColStart = theColStart;
  int32_t aColEnd = theColEnd;
  const uint8_t *aCells = typedLineCells(theRow, aColStart, aColEnd);
  const int32_t aCount = aColEnd - aColStart + 1;
  const tlrx_raster_detail::SCellConversion aConv{mDummyVal, mRealScaleFactor, mImaginaryScaleFactor, mScaleFactor,
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
