// Cell types and data units of rasters: the names written in headers
// ("CellType", "DataUnits" of "RasterInfo"), their small integer codes,
// storage sizes, the complex cell records and the packing of BIT lines.
#pragma once

#include <cstdint>

// ------------------------------------------------------------- cell types

// Codes do not follow the alphabetical or size order of the names: they are
// what older headers and callers store, so they never change.
constexpr int32_t CTLRX_CELL_BYTE = 0;
constexpr int32_t CTLRX_CELL_BYTE_COMPLEX = 1;
constexpr int32_t CTLRX_CELL_UNSIGNED_BYTE = 2;
constexpr int32_t CTLRX_CELL_UBYTE_COMPLEX = 3;
constexpr int32_t CTLRX_CELL_SHORT = 4;
constexpr int32_t CTLRX_CELL_UNSIGNED_SHORT = 5;
constexpr int32_t CTLRX_CELL_SHORT_COMPLEX = 6;
constexpr int32_t CTLRX_CELL_FLOAT = 7;
constexpr int32_t CTLRX_CELL_FLOAT_COMPLEX = 8;
constexpr int32_t CTLRX_CELL_DOUBLE = 9;
constexpr int32_t CTLRX_CELL_DOUBLE_COMPLEX = 10;
constexpr int32_t CTLRX_CELL_UNSIGNED_INT = 11;
constexpr int32_t CTLRX_CELL_INT = 12;
constexpr int32_t CTLRX_CELL_BIT = 13;
constexpr int32_t CTLRX_CELL_UNSIGNED_SHORT_COMPLEX = 14;
constexpr int32_t CTLRX_NBR_CELL_TYPES = 15;
constexpr int32_t CTLRX_CELL_UNKNOWN = -1; // a name outside the vocabulary

// Complex cells: real part first, then imaginary part, no padding.
struct bcomplex {
  int8_t mRe;
  int8_t mIm;
};
struct ubcomplex {
  uint8_t mRe;
  uint8_t mIm;
};
struct scomplex {
  int16_t mRe;
  int16_t mIm;
};
struct uscomplex {
  uint16_t mRe;
  uint16_t mIm;
};
struct fcomplex {
  float mRe;
  float mIm;
};
struct dcomplex {
  double mRe;
  double mIm;
};
static_assert(sizeof(bcomplex) == 2 && sizeof(ubcomplex) == 2, "byte pairs must not be padded");
static_assert(sizeof(scomplex) == 4 && sizeof(uscomplex) == 4, "short pairs must not be padded");
static_assert(sizeof(fcomplex) == 8 && sizeof(dcomplex) == 16, "float pairs must not be padded");

// Exact, case-sensitive lookup; CTLRX_CELL_UNKNOWN for any other text
// (also for a null pointer).
int32_t fdfCellTypeFromName(const char *theName);
// Header name of a code; "WRONG CELL TYPE" outside 0..14.
const char *fdfCellTypeName(int32_t theCellType);
// Bytes per cell; stores the values per cell (2 for complex types, else 1)
// into theDataNbr when given. Outside 0..14 traces "Error: unsupported raster
// file type " with the code and returns -1 (theDataNbr left unchanged).
int32_t fdfCellTypeSize(int32_t theCellType, int32_t *theDataNbr);
// Whether a code names a complex (two-valued) cell type; false when unknown.
bool fdfIsComplexCellType(int32_t theCellType);

// BIT lines: pixel p is bit (7 - p mod 8) of byte p div 8, most significant
// bit first.
constexpr int64_t fdfBitLineBytes(int64_t thePixels) { return (thePixels + 7) / 8; }
inline int fdfGetBit(const uint8_t *theLine, int64_t thePixel) {
  return (theLine[thePixel >> 3] >> (7 - (thePixel & 7))) & 1;
}
inline void fdfSetBit(uint8_t *theLine, int64_t thePixel, bool theValue) {
  const uint8_t aMask = static_cast<uint8_t>(0x80u >> (thePixel & 7));
  theLine[thePixel >> 3] = static_cast<uint8_t>(theValue ? theLine[thePixel >> 3] | aMask
                                                         : theLine[thePixel >> 3] & ~aMask);
}
// Bytes of the cell part of one line: pixels x bytes per cell, or the packed
// line for BIT; -1 for an unknown cell type.
int64_t fdfCellLineBytes(int32_t theCellType, int64_t thePixels);

// ------------------------------------------------------------- data units

constexpr int32_t CTLRX_UNITS_POWER = 0;
constexpr int32_t CTLRX_UNITS_AMPLITUDE = 1;
constexpr int32_t CTLRX_UNITS_SQUARE_ROOT = 2;
constexpr int32_t CTLRX_UNITS_COHERENCE = 3;
constexpr int32_t CTLRX_UNITS_INTERFEROGRAMME = 4;
constexpr int32_t CTLRX_UNITS_SLC = 5;
constexpr int32_t CTLRX_UNITS_CLASSIFICATION = 6;
constexpr int32_t CTLRX_UNITS_RATIO = 7;
constexpr int32_t CTLRX_UNITS_NUMBER = 8;
constexpr int32_t CTLRX_UNITS_OPTICAL_NUMBER = 9;
constexpr int32_t CTLRX_UNITS_ERS_RAW = 10;
constexpr int32_t CTLRX_UNITS_UNWRAPPED_PHASE = 11;
constexpr int32_t CTLRX_UNITS_DEM = 12;
constexpr int32_t CTLRX_UNITS_SLOPE = 13;
constexpr int32_t CTLRX_UNITS_SYNTHETIC_INTERFEROGRAMME = 14;
constexpr int32_t CTLRX_UNITS_FLATTENED_INTERFEROGRAMME = 15;
constexpr int32_t CTLRX_UNITS_RESOLUTION = 16;
constexpr int32_t CTLRX_UNITS_PTM_RESOLUTION = 17;
constexpr int32_t CTLRX_UNITS_CALIBRATED = 18;
constexpr int32_t CTLRX_UNITS_JERS_1_RAW = 19;
constexpr int32_t CTLRX_UNITS_PHASE = 20;
constexpr int32_t CTLRX_UNITS_DR = 21;
constexpr int32_t CTLRX_UNITS_SIR_C_RAW = 22;
constexpr int32_t CTLRX_UNITS_TRANSPLANTING = 23;
constexpr int32_t CTLRX_UNITS_BINARY_MASK = 24;
constexpr int32_t CTLRX_UNITS_VEGETATION_INDEX = 25;
constexpr int32_t CTLRX_UNITS_DMP = 26;
constexpr int32_t CTLRX_UNITS_PTM_ACCURACY = 27;
constexpr int32_t CTLRX_UNITS_ALPHA = 28;
constexpr int32_t CTLRX_UNITS_ENTROPY = 29;
constexpr int32_t CTLRX_UNITS_ANISOTROPY = 30;
constexpr int32_t CTLRX_UNITS_EDGE_MAP = 31;
constexpr int32_t CTLRX_UNITS_REGION_MERGING_MAP = 32;
constexpr int32_t CTLRX_UNITS_REGION_MERGING_MODULE = 33;
constexpr int32_t CTLRX_UNITS_LOGARITMIC = 34;
constexpr int32_t CTLRX_UNITS_LIA = 35;
constexpr int32_t CTLRX_UNITS_SRDISTANCE = 36;
constexpr int32_t CTLRX_UNITS_RADIANCE = 37;
constexpr int32_t CTLRX_UNITS_REFLECTANCE = 38;
constexpr int32_t CTLRX_NBR_DATA_UNITS = 39;
constexpr int32_t CTLRX_UNITS_UNKNOWN = -1; // unknown name, or no "DataUnits" in the header

// Exact, case-sensitive lookup; CTLRX_UNITS_UNKNOWN for any other text.
int32_t fdfDataUnitsFromName(const char *theName);
// Header name of a code; "WRONG UNITS" outside 0..38.
const char *fdfDataUnitsName(int32_t theDataUnits);
