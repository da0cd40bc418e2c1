// Vocabularies of cell types and data units, kept as tables indexed by code.
#include "tlrx_cell_types.h"

#include <cstring>

#include "tlrx_enviroment.h"

namespace {

struct STLRXCellTypeInfo {
  const char *mName;
  int32_t mBytes;
  int32_t mDataNbr;
};

// Indexed by code.
constexpr STLRXCellTypeInfo CTLRX_CELL_TYPE_TABLE[CTLRX_NBR_CELL_TYPES] = {
    {"BYTE", 1, 1},
    {"BYTE_COMPLEX", 2, 2},
    {"UNSIGNED_BYTE", 1, 1},
    {"UBYTE_COMPLEX", 2, 2},
    {"SHORT", 2, 1},
    {"UNSIGNED_SHORT", 2, 1},
    {"SHORT_COMPLEX", 4, 2},
    {"FLOAT", 4, 1},
    {"FLOAT_COMPLEX", 8, 2},
    {"DOUBLE", 8, 1},
    {"DOUBLE_COMPLEX", 16, 2},
    {"UNSIGNED_INT", 4, 1},
    {"INT", 4, 1},
    {"BIT", 1, 1},
    {"UNSIGNED_SHORT_COMPLEX", 4, 2},
};

// Indexed by code.
constexpr const char *CTLRX_DATA_UNITS_TABLE[CTLRX_NBR_DATA_UNITS] = {
    "POWER", "AMPLITUDE", "SQUARE ROOT", "COHERENCE", // 0
    "INTERFEROGRAMME", "SLC", "CLASSIFICATION", "RATIO", // 4
    "NUMBER", "OPTICAL NUMBER", "ERS RAW", "UNWRAPPED PHASE", // 8
    "DEM", "SLOPE", "SYNTHETIC INTERFEROGRAMME", "FLATTENED INTERFEROGRAMME", // 12
    "RESOLUTION", "PTM RESOLUTION", "CALIBRATED", "JERS 1 RAW", // 16
    "PHASE", "DR", "SIR-C RAW", "TRANSPLANTING", // 20
    "BINARY_MASK", "VEGETATION_INDEX", "DMP", "PTM ACCURACY", // 24
    "ALPHA", "ENTROPY", "ANISOTROPY", "EDGE MAP", // 28
    "REGION MERGING MAP", "REGION MERGING MODULE", "LOGARITMIC", "LIA", // 32
    "SRDISTANCE", "RADIANCE", "REFLECTANCE", // 36
};

bool isCellType(int32_t theCellType) { return theCellType >= 0 && theCellType < CTLRX_NBR_CELL_TYPES; }

} // namespace

int32_t fdfCellTypeFromName(const char *theName) {
  if (theName == nullptr)
    return CTLRX_CELL_UNKNOWN;
  for (int32_t i = 0; i < CTLRX_NBR_CELL_TYPES; ++i)
    if (std::strcmp(theName, CTLRX_CELL_TYPE_TABLE[i].mName) == 0)
      return i;
  return CTLRX_CELL_UNKNOWN;
}

const char *fdfCellTypeName(int32_t theCellType) {
  return isCellType(theCellType) ? CTLRX_CELL_TYPE_TABLE[theCellType].mName : "WRONG CELL TYPE";
}

int32_t fdfCellTypeSize(int32_t theCellType, int32_t *theDataNbr) {
  if (!isCellType(theCellType)) {
    fdfTraceMessage("Error: unsupported raster file type %d\n", static_cast<int>(theCellType));
    return -1;
  }
  if (theDataNbr != nullptr)
    *theDataNbr = CTLRX_CELL_TYPE_TABLE[theCellType].mDataNbr;
  return CTLRX_CELL_TYPE_TABLE[theCellType].mBytes;
}

bool fdfIsComplexCellType(int32_t theCellType) {
  return isCellType(theCellType) && CTLRX_CELL_TYPE_TABLE[theCellType].mDataNbr == 2;
}

int64_t fdfCellLineBytes(int32_t theCellType, int64_t thePixels) {
  if (!isCellType(theCellType))
    return -1;
  if (theCellType == CTLRX_CELL_BIT)
    return fdfBitLineBytes(thePixels);
  return thePixels * CTLRX_CELL_TYPE_TABLE[theCellType].mBytes;
}

int32_t fdfDataUnitsFromName(const char *theName) {
  if (theName == nullptr)
    return CTLRX_UNITS_UNKNOWN;
  for (int32_t i = 0; i < CTLRX_NBR_DATA_UNITS; ++i)
    if (std::strcmp(theName, CTLRX_DATA_UNITS_TABLE[i]) == 0)
      return i;
  return CTLRX_UNITS_UNKNOWN;
}

const char *fdfDataUnitsName(int32_t theDataUnits) {
  return theDataUnits >= 0 && theDataUnits < CTLRX_NBR_DATA_UNITS ? CTLRX_DATA_UNITS_TABLE[theDataUnits]
                                                                   : "WRONG UNITS";
}
