// Cell-type and data-unit vocabularies, sizes, BIT packing.
#include <gtest/gtest.h>
#include "tlrx_cell_types.h"
#include "tlrx_enviroment.h"
#include "tlrx_test_support.h"
#include "tlrx_trace_test_support.h"

namespace {

// The vocabularies as headers use them, written out independently of the library.
const struct SCellTypeRow {
  int32_t mCode;
  const char *mName;
  int32_t mBytes;
  int32_t mValues;
} sCellTypes[] = {
    {0, "BYTE", 1, 1},          {1, "BYTE_COMPLEX", 2, 2},     {2, "UNSIGNED_BYTE", 1, 1},
    {3, "UBYTE_COMPLEX", 2, 2}, {4, "SHORT", 2, 1},            {5, "UNSIGNED_SHORT", 2, 1},
    {6, "SHORT_COMPLEX", 4, 2}, {7, "FLOAT", 4, 1},            {8, "FLOAT_COMPLEX", 8, 2},
    {9, "DOUBLE", 8, 1},        {10, "DOUBLE_COMPLEX", 16, 2}, {11, "UNSIGNED_INT", 4, 1},
    {12, "INT", 4, 1},          {13, "BIT", 1, 1},             {14, "UNSIGNED_SHORT_COMPLEX", 4, 2},
};

const std::vector<std::string> sDataUnits = {
    "POWER", "AMPLITUDE", "SQUARE ROOT", "COHERENCE", "INTERFEROGRAMME", "SLC", "CLASSIFICATION", "RATIO",
    "NUMBER", "OPTICAL NUMBER", "ERS RAW", "UNWRAPPED PHASE", "DEM", "SLOPE", "SYNTHETIC INTERFEROGRAMME",
    "FLATTENED INTERFEROGRAMME", "RESOLUTION", "PTM RESOLUTION", "CALIBRATED", "JERS 1 RAW", "PHASE", "DR",
    "SIR-C RAW", "TRANSPLANTING", "BINARY_MASK", "VEGETATION_INDEX", "DMP", "PTM ACCURACY", "ALPHA", "ENTROPY",
    "ANISOTROPY", "EDGE MAP", "REGION MERGING MAP", "REGION MERGING MODULE", "LOGARITMIC", "LIA", "SRDISTANCE",
    "RADIANCE", "REFLECTANCE",
};

} // namespace

TEST(CellTypes, EveryNameHasItsCodeSizeAndValueCount) {
  ASSERT_EQ(std::size(sCellTypes), static_cast<size_t>(CTLRX_NBR_CELL_TYPES));
  for (const SCellTypeRow &aRow : sCellTypes) {
    SCOPED_TRACE(aRow.mName);
    EXPECT_EQ(fdfCellTypeFromName(aRow.mName), aRow.mCode);
    EXPECT_STREQ(fdfCellTypeName(aRow.mCode), aRow.mName);
    int32_t aValues = -7;
    EXPECT_EQ(fdfCellTypeSize(aRow.mCode, &aValues), aRow.mBytes);
    EXPECT_EQ(aValues, aRow.mValues);
    EXPECT_EQ(fdfIsComplexCellType(aRow.mCode), aRow.mValues == 2);
  }
  EXPECT_EQ(CTLRX_CELL_FLOAT_COMPLEX, 8);
  EXPECT_EQ(CTLRX_CELL_UNSIGNED_SHORT_COMPLEX, 14); // codes do not follow the name order
  EXPECT_EQ(fdfCellTypeSize(CTLRX_CELL_BIT, nullptr), 1); // the value count is optional
}

TEST(CellTypes, UnknownNamesAndCodes) {
  for (const char *aName : {"float_complex", "Float", "FLOAT ", " FLOAT", "FLOATX", "", "COMPLEX", "BYTES"})
    EXPECT_EQ(fdfCellTypeFromName(aName), CTLRX_CELL_UNKNOWN) << "[" << aName << "]";
  EXPECT_EQ(fdfCellTypeFromName(nullptr), CTLRX_CELL_UNKNOWN);
  for (int32_t aCode : {-1, 15, 99, -2147483647 - 1}) {
    int32_t aValues = 123;
    EXPECT_EQ(fdfCellTypeSize(aCode, &aValues), -1) << aCode;
    EXPECT_EQ(aValues, 123) << "value count untouched for " << aCode;
    EXPECT_STREQ(fdfCellTypeName(aCode), "WRONG CELL TYPE");
    EXPECT_FALSE(fdfIsComplexCellType(aCode));
    EXPECT_EQ(fdfCellLineBytes(aCode, 10), -1);
  }
  for (const char *aName : {"power", "SQUARE_ROOT", "SIR-C  RAW", "AMPLITUDE ", "", "DB"})
    EXPECT_EQ(fdfDataUnitsFromName(aName), CTLRX_UNITS_UNKNOWN) << "[" << aName << "]";
  EXPECT_EQ(fdfDataUnitsFromName(nullptr), CTLRX_UNITS_UNKNOWN);
  for (int32_t aCode : {-1, 39, 1000})
    EXPECT_STREQ(fdfDataUnitsName(aCode), "WRONG UNITS");
  CTempDir aDir;
  tlrxStartLibraryEnvironment(aDir.path());
  ASSERT_TRUE(tlrxStartTrace());
  EXPECT_EQ(fdfCellTypeSize(15, nullptr), -1);
  EXPECT_NE(tlrxStopTrace(aDir.path()).find("Error: unsupported raster file type 15"), std::string::npos);
}

TEST(DataUnits, EveryNameHasItsCode) {
  ASSERT_EQ(sDataUnits.size(), static_cast<size_t>(CTLRX_NBR_DATA_UNITS));
  for (size_t i = 0; i < sDataUnits.size(); ++i) {
    EXPECT_EQ(fdfDataUnitsFromName(sDataUnits[i].c_str()), static_cast<int32_t>(i)) << sDataUnits[i];
    EXPECT_STREQ(fdfDataUnitsName(static_cast<int32_t>(i)), sDataUnits[i].c_str());
  }
  EXPECT_EQ(CTLRX_UNITS_INTERFEROGRAMME, 4);
  EXPECT_EQ(CTLRX_UNITS_FLATTENED_INTERFEROGRAMME, 15);
  EXPECT_EQ(CTLRX_UNITS_REFLECTANCE, 38);
}

TEST(CellTypes, BitLinesPackEightPixelsMostSignificantFirst) {
  for (const auto &[aPixels, aBytes] : {std::pair{8, 1}, std::pair{9, 2}, std::pair{10, 2}})
    EXPECT_EQ(fdfBitLineBytes(aPixels), aBytes) << aPixels;
  EXPECT_EQ(fdfCellLineBytes(CTLRX_CELL_BIT, 9), 2);
  EXPECT_EQ(fdfCellLineBytes(CTLRX_CELL_DOUBLE_COMPLEX, 3), 48);
  uint8_t aLine[2] = {0, 0};
  fdfSetBit(aLine, 8, true); // pixel 8: top bit of the second byte
  EXPECT_EQ(aLine[0] * 256 + aLine[1], 0x0080);
  fdfSetBit(aLine, 0, true);
  fdfSetBit(aLine, 7, true);
  EXPECT_EQ(aLine[0], 0x81);
  fdfSetBit(aLine, 0, false);
  EXPECT_EQ(aLine[0], 0x01);
  const uint8_t aPattern[2] = {0xA5, 0x40}; // 1010 0101 0100 0000
  const int aExpected[10] = {1, 0, 1, 0, 0, 1, 0, 1, 0, 1};
  for (int p = 0; p < 10; ++p)
    EXPECT_EQ(fdfGetBit(aPattern, p), aExpected[p]) << "pixel " << p;
}
