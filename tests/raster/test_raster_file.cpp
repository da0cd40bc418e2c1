// Raster file: round trips of every cell type and layout against an
// independent encoder, typed access, caches, 64-bit positioning, closing,
// and refusal of bad input with its code.
#include <gtest/gtest.h>

#include <cfloat>
#include <cmath>
#include <complex>
#include <cstring>
#include <fcntl.h>
#include <functional>
#include <string>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

#include "tlrx_description_section.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_raster_file.h"
#include "tlrx_standard_header.h"
#include "tlrx_test_support.h"
#include "tlrx_trace_test_support.h"

namespace {

constexpr double sTolerance = 1.1754943508222875e-38;

bool machineIsMSBF() {
  const uint16_t aProbe = 1;
  uint8_t aFirst;
  std::memcpy(&aFirst, &aProbe, 1);
  return aFirst == 0;
}

enum class EKind { kSigned, kUnsigned, kFloat, kBit };

// Storage of each cell type, written out independently of the library.
struct STypeInfo {
  int32_t mCode;
  int mComponentBytes;
  int mValues;
  EKind mKind;
};

const std::vector<STypeInfo> sTypes = {
    {0, 1, 1, EKind::kSigned},   {1, 1, 2, EKind::kSigned},   {2, 1, 1, EKind::kUnsigned},
    {3, 1, 2, EKind::kUnsigned}, {4, 2, 1, EKind::kSigned},   {5, 2, 1, EKind::kUnsigned},
    {6, 2, 2, EKind::kSigned},   {7, 4, 1, EKind::kFloat},    {8, 4, 2, EKind::kFloat},
    {9, 8, 1, EKind::kFloat},    {10, 8, 2, EKind::kFloat},   {11, 4, 1, EKind::kUnsigned},
    {12, 4, 1, EKind::kSigned},  {14, 2, 2, EKind::kUnsigned},
};

// One component in the given byte order, whatever the machine's.
void encodeComponent(double theValue, const STypeInfo &theType, bool theMSBF, uint8_t *theOut) {
  uint64_t aBits = 0;
  if (theType.mKind == EKind::kFloat && theType.mComponentBytes == 4) {
    const float aValue = static_cast<float>(theValue);
    uint32_t aWord;
    std::memcpy(&aWord, &aValue, 4);
    aBits = aWord;
  } else if (theType.mKind == EKind::kFloat) {
    std::memcpy(&aBits, &theValue, 8);
  } else if (theType.mKind == EKind::kSigned) {
    aBits = static_cast<uint64_t>(static_cast<int64_t>(theValue));
  } else {
    aBits = static_cast<uint64_t>(theValue);
  }
  const int aWidth = theType.mComponentBytes;
  for (int b = 0; b < aWidth; ++b) {
    const uint8_t aByte = static_cast<uint8_t>(aBits >> (8 * b));
    theOut[theMSBF ? aWidth - 1 - b : b] = aByte;
  }
}

using TGrid = std::vector<std::vector<std::vector<double>>>; // [row][col][part]

struct SLayout {
  int32_t mHeader;
  int32_t mPrefix;
  int32_t mSuffix;
};

// Cells of one line, columns theColStart..theColEnd.
std::vector<uint8_t> encodeCells(const TGrid &theGrid, const STypeInfo &theType, bool theMSBF, int theRow,
                                 int theColStart, int theColEnd) {
  const int aCellBytes = theType.mComponentBytes * theType.mValues;
  std::vector<uint8_t> aOut(static_cast<size_t>(aCellBytes * (theColEnd - theColStart + 1)));
  for (int c = theColStart; c <= theColEnd; ++c)
    for (int p = 0; p < theType.mValues; ++p)
      encodeComponent(theGrid[theRow][c][p], theType, theMSBF,
                      aOut.data() + (c - theColStart) * aCellBytes + p * theType.mComponentBytes);
  return aOut;
}

// The whole file image: header bytes, then prefix + cells + suffix per line.
std::string encodeFile(const TGrid &theGrid, const STypeInfo &theType, bool theMSBF, const SLayout &theLayout,
                       uint8_t theFill) {
  std::string aFile(static_cast<size_t>(theLayout.mHeader), static_cast<char>(theFill));
  const int aCols = static_cast<int>(theGrid[0].size());
  for (size_t r = 0; r < theGrid.size(); ++r) {
    aFile.append(static_cast<size_t>(theLayout.mPrefix), static_cast<char>(theFill));
    const std::vector<uint8_t> aCells = encodeCells(theGrid, theType, theMSBF, static_cast<int>(r), 0, aCols - 1);
    aFile.append(reinterpret_cast<const char *>(aCells.data()), aCells.size());
    aFile.append(static_cast<size_t>(theLayout.mSuffix), static_cast<char>(theFill));
  }
  return aFile;
}

double componentValue(const STypeInfo &theType, int theRow, int theCol, int thePart) {
  const int k = (theRow * 31 + theCol * 7 + thePart * 13) % 100;
  switch (theType.mKind) {
  case EKind::kSigned: return k - 50;
  case EKind::kUnsigned: return k;
  default: return (k - 50) * 0.25;
  }
}

// Cell (1, 3) is no data; cell (2, 4) has only its first part equal to it.
TGrid makeGrid(const STypeInfo &theType, int theRows, int theCols, double theNull) {
  TGrid aGrid(theRows, std::vector<std::vector<double>>(theCols));
  for (int r = 0; r < theRows; ++r)
    for (int c = 0; c < theCols; ++c)
      for (int p = 0; p < theType.mValues; ++p)
        aGrid[r][c].push_back(componentValue(theType, r, c, p));
  aGrid[1][3].assign(theType.mValues, theNull);
  aGrid[2][4][0] = theNull;
  return aGrid;
}

// The typed value by the rule, computed directly.
double expectedValue(const std::vector<double> &theCell, double theNull, double theRealScale, double theImagScale,
                     bool theAmplitude) {
  const auto aIsNull = [&](double theValue) {
    return (std::isnan(theNull) && std::isnan(theValue)) ||
           (theNull - sTolerance <= theValue && theValue <= theNull + sTolerance);
  };
  const bool aScale = !(theRealScale == 1.0 && theImagScale == 1.0);
  if (theCell.size() == 1)
    return aIsNull(theCell[0]) ? theNull : (aScale ? theCell[0] * theRealScale : theCell[0]);
  if (aIsNull(theCell[0]) && aIsNull(theCell[1]))
    return theNull;
  const double aRe = theCell[0] * theRealScale;
  const double aIm = theCell[1] * theImagScale;
  const double aPower = aRe * aRe + aIm * aIm;
  return theAmplitude ? std::sqrt(aPower) : aPower;
}

template <typename T>
void expectSameValues(const std::vector<T> &theActual, const std::vector<T> &theExpected, const std::string &theWhat) {
  ASSERT_EQ(theActual.size(), theExpected.size()) << theWhat;
  for (size_t i = 0; i < theActual.size(); ++i) {
    if (std::isnan(theExpected[i]))
      EXPECT_TRUE(std::isnan(theActual[i])) << theWhat << " cell " << i;
    else
      EXPECT_EQ(theActual[i], theExpected[i]) << theWhat << " cell " << i;
  }
}

// Runs theBody and checks it raises theCode.
void expectCode(int32_t theCode, const std::function<void()> &theBody, const std::string &theWhat = "") {
  try {
    theBody();
    ADD_FAILURE() << "no error raised, expected " << theCode << " " << theWhat;
  } catch (const CErrorExceptionManager &aError) {
    EXPECT_EQ(aError.mCode, theCode) << theWhat << " message [" << aError.mMessage << "]";
  }
}

std::vector<uint8_t> bytesOf(const std::string &theText) { return std::vector<uint8_t>(theText.begin(), theText.end()); }

class RasterFileTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }

  CRasterFileParam param(const std::string &theName, int32_t theCellType, int32_t theLines, int32_t thePixels) const {
    CRasterFileParam aParam;
    aParam.mFileName = mDir.file(theName);
    aParam.mCellType = theCellType;
    aParam.mNrOfLinesPerImage = theLines;
    aParam.mNrOfPixelsPerLine = thePixels;
    return aParam;
  }

  void startTrace() { ASSERT_TRUE(tlrxStartTrace()); }
  std::string traceText() { return tlrxStopTrace(mDir.path()); }
  void TearDown() override {
    if (fdfIsTracing())
      traceText();
  }
};

struct SRoundTripCase {
  SLayout mLayout;
  bool mMSBF;
  double mRealScale;
  double mImagScale;
};

} // namespace

// ------------------------------------------------------------ round trips

TEST_F(RasterFileTest, EveryCellTypeRoundTripsInBothByteOrdersAndLayouts) {
  const int aRows = 5;
  const int aCols = 9;
  const double aNull = 7.0;
  const std::vector<SRoundTripCase> aCases = {
      {{0, 0, 0}, false, 1.0, 1.0},
      {{0, 0, 0}, true, 1.0, 1.0},
      {{7, 3, 5}, false, 2.0, 0.5},
      {{7, 3, 5}, true, 1.0, 1.0},
      {{16, 0, 2}, true, 0.5, 1.0},
  };
  for (const STypeInfo &aType : sTypes) {
    for (size_t k = 0; k < aCases.size(); ++k) {
      const SRoundTripCase &aCase = aCases[k];
      const std::string aWhat = std::string(fdfCellTypeName(aType.mCode)) + " case " + std::to_string(k);
      const TGrid aGrid = makeGrid(aType, aRows, aCols, aNull);
      CRasterFileParam aParam = param("rt_" + std::to_string(aType.mCode) + "_" + std::to_string(k) + ".raw",
                                      aType.mCode, aRows, aCols);
      aParam.mHeaderOffset = aCase.mLayout.mHeader;
      aParam.mRowPrefix = aCase.mLayout.mPrefix;
      aParam.mRowSuffix = aCase.mLayout.mSuffix;
      aParam.mMSBF = aCase.mMSBF;
      aParam.mNullCellValue = aNull;
      aParam.mRealScaleFactor = aCase.mRealScale;
      aParam.mImaginaryScaleFactor = aCase.mImagScale;

      // Write: a block of two lines, one line through the line buffer, the
      // rest line by line. Sources are in machine order and stay unchanged.
      {
        CRasterFile aFile;
        aFile.open_write(aParam);
        EXPECT_EQ(aFile.isSwapped(), aCase.mMSBF != machineIsMSBF() && aType.mComponentBytes > 1) << aWhat;
        std::vector<uint8_t> aBlock = encodeCells(aGrid, aType, machineIsMSBF(), 0, 0, aCols - 1);
        const std::vector<uint8_t> aLine1 = encodeCells(aGrid, aType, machineIsMSBF(), 1, 0, aCols - 1);
        aBlock.insert(aBlock.end(), aLine1.begin(), aLine1.end());
        const std::vector<uint8_t> aBlockCopy = aBlock;
        EXPECT_EQ(aFile.writeRecords(0, 2, aBlock.data()), 2);
        EXPECT_EQ(aBlock, aBlockCopy) << aWhat << ": the caller's cells were modified";
        const std::vector<uint8_t> aLine2 = encodeCells(aGrid, aType, machineIsMSBF(), 2, 0, aCols - 1);
        std::memcpy(aFile.getLineBuffer(2), aLine2.data(), aLine2.size());
        aFile.putLine(2);
        for (int r = 3; r < aRows; ++r)
          aFile.putLine(r, encodeCells(aGrid, aType, machineIsMSBF(), r, 0, aCols - 1).data());
        aFile.close();
        EXPECT_EQ(aFile.getRasterStatus(), CTLRX_RF_CLOSE);
      }
      // Header, prefixes and suffixes are zero; cells in the stored order.
      EXPECT_EQ(bytesOf(tlrxReadFile(aParam.mFileName)),
                bytesOf(encodeFile(aGrid, aType, aCase.mMSBF, aCase.mLayout, 0)))
          << aWhat;

      // Read back our own file, and an independently made one whose header,
      // prefixes and suffixes hold junk.
      const std::string aForeign = aParam.mFileName + ".foreign";
      tlrxWriteFile(aForeign, encodeFile(aGrid, aType, aCase.mMSBF, aCase.mLayout, 0xEE));
      for (const std::string &aName : {aParam.mFileName, aForeign}) {
        CRasterFileParam aReadParam = aParam;
        aReadParam.mFileName = aName;
        CRasterFile aFile;
        aFile.open_read(aReadParam);
        for (int r = 0; r < aRows; ++r) {
          for (bool aAmplitude : {false, true}) {
            std::vector<double> aExpected;
            for (int c = 0; c < aCols; ++c)
              aExpected.push_back(expectedValue(aGrid[r][c], aNull, aCase.mRealScale, aCase.mImagScale, aAmplitude));
            std::vector<double> aLine(aCols);
            aFile.getLine(aLine.data(), r, 0, -1, aAmplitude);
            expectSameValues(aLine, aExpected, aWhat + " double row " + std::to_string(r));
            // Column window 2..6 as float.
            std::vector<float> aWindow(5);
            aFile.getLine(aWindow.data(), r, 2, 6, aAmplitude);
            std::vector<float> aExpectedWindow;
            for (int c = 2; c <= 6; ++c)
              aExpectedWindow.push_back(static_cast<float>(aExpected[c]));
            expectSameValues(aWindow, aExpectedWindow, aWhat + " float window row " + std::to_string(r));
          }
        }
        // Raw cells of a block with a column window, in machine order.
        std::vector<uint8_t> aRaw(static_cast<size_t>(3 * 4 * aType.mComponentBytes * aType.mValues), 0x5A);
        EXPECT_EQ(aFile.readRecords(1, 3, 1, 4, aRaw.data()), 3);
        std::vector<uint8_t> aRawExpected;
        for (int r = 1; r <= 3; ++r) {
          const std::vector<uint8_t> aCells = encodeCells(aGrid, aType, machineIsMSBF(), r, 1, 4);
          aRawExpected.insert(aRawExpected.end(), aCells.begin(), aCells.end());
        }
        EXPECT_EQ(aRaw, aRawExpected) << aWhat << " raw window of " << aName;
        aFile.close();
      }
    }
  }
}

TEST_F(RasterFileTest, BitRastersPackEightPixelsPerByte) {
  const int aRows = 4;
  const int aCols = 10;
  const auto aBit = [](int theRow, int theCol) { return (theRow * 3 + theCol) % 3 == 0 || theCol == 8; };
  // Records of 10 BIT pixels: prefix + 2 + suffix bytes.
  CRasterFileParam aParam = param("bits.raw", CTLRX_CELL_BIT, aRows, aCols);
  aParam.mRowPrefix = 1;
  aParam.mRowSuffix = 3;
  aParam.mHeaderOffset = 2;
  aParam.mMSBF = !machineIsMSBF(); // never swapped: single bytes
  aParam.mNullCellValue = -1.0;
  std::string aExpected(2, '\0');
  {
    CRasterFile aFile;
    aFile.open_write(aParam);
    EXPECT_EQ(aFile.getRecordLen(), 1 + 2 + 3);
    EXPECT_FALSE(aFile.isSwapped());
    for (int r = 0; r < aRows; ++r) {
      uint8_t aLine[2] = {0, 0};
      for (int c = 0; c < aCols; ++c)
        if (aBit(r, c))
          aLine[c / 8] = static_cast<uint8_t>(aLine[c / 8] | (0x80 >> (c % 8)));
      aFile.writeRecords(r, 1, aLine, 3, 5); // a window is widened to the whole packed line
      aExpected += std::string(1, '\0') + std::string(reinterpret_cast<char *>(aLine), 2) + std::string(3, '\0');
    }
    aFile.close();
  }
  EXPECT_EQ(tlrxReadFile(aParam.mFileName), aExpected);
  CRasterFile aFile;
  aFile.open_read(aParam);
  for (int r = 0; r < aRows; ++r) {
    std::vector<float> aLine(aCols);
    aFile.getLine(aLine.data(), r);
    for (int c = 0; c < aCols; ++c)
      EXPECT_EQ(aLine[c], aBit(r, c) ? 1.0f : 0.0f) << r << "," << c;
    std::vector<double> aWindow(3);
    aFile.getLine(aWindow.data(), r, 7, 9);
    for (int c = 7; c <= 9; ++c)
      EXPECT_EQ(aWindow[c - 7], aBit(r, c) ? 1.0 : 0.0) << r << "," << c;
  }
  // The raw line is always whole, whatever the requested columns.
  uint8_t aRaw[2] = {0, 0};
  aFile.readRecords(0, 1, 8, 9, aRaw);
  EXPECT_EQ(aRaw[1] & 0x80, 0x80); // pixel 8 is the top bit of the second byte
}

TEST_F(RasterFileTest, ReversedLinesAndPixelsFollowTheCallersOrder) {
  const STypeInfo &aType = sTypes[7]; // FLOAT
  const TGrid aGrid = makeGrid(aType, 6, 8, 7.0);
  CRasterFileParam aParam = param("rev.raw", CTLRX_CELL_FLOAT, 6, 8);
  aParam.mNullCellValue = 7.0;
  tlrxWriteFile(aParam.mFileName, encodeFile(aGrid, aType, aParam.mMSBF, {0, 0, 0}, 0));
  aParam.mLinesReversed = true;
  aParam.mPixelsReversed = true;
  CRasterFile aFile;
  aFile.open_read(aParam);
  for (int r = 0; r < 6; ++r) {
    std::vector<double> aLine(3);
    aFile.getLine(aLine.data(), r, 1, 3);
    // Caller column c is file column 7 - c of file line 5 - r.
    for (int c = 1; c <= 3; ++c)
      EXPECT_EQ(aLine[c - 1], expectedValue(aGrid[5 - r][7 - c], 7.0, 1, 1, false)) << r << "," << c;
  }
}

TEST_F(RasterFileTest, IntegerExtremesAndNoDataTolerance) {
  struct SCase {
    int32_t mCellType;
    int mComponentBytes;
    EKind mKind;
    std::vector<double> mCells;
    double mNull;
  };
  const float aFloat01 = 0.1f;
  const std::vector<SCase> aCases = {
      {CTLRX_CELL_UNSIGNED_INT, 4, EKind::kUnsigned, {4294967295.0, 0, 7, 8}, 7.5},
      {CTLRX_CELL_INT, 4, EKind::kSigned, {-2147483648.0, 2147483647.0, 7, -7}, 7.0},
      {CTLRX_CELL_UNSIGNED_SHORT, 2, EKind::kUnsigned, {65535, 0, 1, 2}, 65535},
      {CTLRX_CELL_SHORT, 2, EKind::kSigned, {-32768, 32767, 0, 1}, 0.0},
      {CTLRX_CELL_FLOAT, 4, EKind::kFloat, {1e-38, 2e-38, -1e-38, 5.0}, 0.0},
      {CTLRX_CELL_FLOAT, 4, EKind::kFloat, {aFloat01, 0.1, 5.0, 0.0}, 0.1},
      {CTLRX_CELL_DOUBLE, 8, EKind::kFloat, {1e-38, 1.2e-38, -1.1e-38, 3.0}, 0.0},
      {CTLRX_CELL_DOUBLE, 8, EKind::kFloat, {NAN, 1.0, INFINITY, NAN}, NAN},
      {CTLRX_CELL_FLOAT, 4, EKind::kFloat, {INFINITY, -INFINITY, 1e30, 2.0}, INFINITY},
  };
  for (size_t k = 0; k < aCases.size(); ++k) {
    const SCase &aCase = aCases[k];
    const STypeInfo aType{aCase.mCellType, aCase.mComponentBytes, 1, aCase.mKind};
    TGrid aGrid(1, std::vector<std::vector<double>>(aCase.mCells.size()));
    for (size_t c = 0; c < aCase.mCells.size(); ++c)
      aGrid[0][c] = {aCase.mComponentBytes == 4 && aCase.mKind == EKind::kFloat
                         ? static_cast<double>(static_cast<float>(aCase.mCells[c]))
                         : aCase.mCells[c]};
    CRasterFileParam aParam = param("x" + std::to_string(k), aCase.mCellType, 1, static_cast<int32_t>(aGrid[0].size()));
    aParam.mNullCellValue = aCase.mNull;
    aParam.mMSBF = true;
    tlrxWriteFile(aParam.mFileName, encodeFile(aGrid, aType, true, {0, 0, 0}, 0));
    CRasterFile aFile;
    aFile.open_read(aParam);
    std::vector<double> aLine(aGrid[0].size());
    std::vector<float> aFloats(aGrid[0].size());
    aFile.getLine(aLine.data(), 0);
    aFile.getLine(aFloats.data(), 0);
    std::vector<double> aExpected;
    std::vector<float> aExpectedFloats;
    for (const std::vector<double> &aCell : aGrid[0]) {
      aExpected.push_back(expectedValue(aCell, aCase.mNull, 1, 1, false));
      aExpectedFloats.push_back(static_cast<float>(aExpected.back()));
    }
    expectSameValues(aLine, aExpected, "case " + std::to_string(k));
    expectSameValues(aFloats, aExpectedFloats, "float case " + std::to_string(k));
  }
}

TEST_F(RasterFileTest, ScaleFactorsOfOneAreNoScalingAndNaNScalesEverything) {
  CRasterFileParam aParam = param("s.raw", CTLRX_CELL_SHORT, 1, 3);
  const int16_t aCells[3] = {3, -4, 7};
  tlrxWriteFile(aParam.mFileName, std::string(reinterpret_cast<const char *>(aCells), sizeof(aCells)));
  aParam.mMSBF = machineIsMSBF();
  aParam.mNullCellValue = 7;
  std::vector<double> aLine(3);
  {
    aParam.mRealScaleFactor = NAN;
    CRasterFile aFile;
    aFile.open_read(aParam);
    aFile.getLine(aLine.data(), 0);
    EXPECT_TRUE(std::isnan(aLine[0]) && std::isnan(aLine[1]));
    EXPECT_EQ(aLine[2], 7.0); // no data stays no data
  }
  {
    aParam.mRealScaleFactor = 1.0;
    aParam.mImaginaryScaleFactor = 3.0; // any factor other than 1 turns scaling on
    CRasterFile aFile;
    aFile.open_read(aParam);
    aFile.getLine(aLine.data(), 0);
    EXPECT_EQ(aLine, (std::vector<double>{3, -4, 7}));
  }
}

TEST_F(RasterFileTest, ValidMaskMarksNoDataCells) {
  CRasterFileParam aParam = param("m.raw", CTLRX_CELL_FLOAT, 1, 5);
  const float aCells[5] = {NAN, 5.0f, 0.0f, 1e-39f, -2.0f};
  tlrxWriteFile(aParam.mFileName, std::string(reinterpret_cast<const char *>(aCells), sizeof(aCells)));
  aParam.mMSBF = machineIsMSBF();
  std::vector<double> aLine(5);
  std::vector<int32_t> aMask(5, 9);
  for (const auto &aCase : std::vector<std::pair<double, std::vector<int32_t>>>{
           {NAN, {0, 1, 1, 1, 1}}, {5.0, {1, 0, 1, 1, 1}}, {0.0, {1, 1, 0, 0, 1}}}) {
    aParam.mNullCellValue = aCase.first;
    CRasterFile aFile;
    aFile.open_read(aParam);
    aFile.getValidMask(aLine.data(), aMask.data(), 0);
    EXPECT_EQ(aMask, aCase.second) << "null " << aCase.first;
  }
}

// ------------------------------------------------------------ complex lines

namespace {

bool sameNumber(double theActual, double theExpected) {
  return std::isnan(theExpected) ? std::isnan(theActual) : theActual == theExpected;
}

// The complex value of a grid cell by the rule, computed directly: (D, D)
// when both parts are no data, else the scaled parts.
std::complex<double> expectedComplex(const std::vector<double> &theCell, double theNull, double theRealScale,
                                     double theImagScale, bool &theValid) {
  const auto aIsNull = [&](double theValue) {
    return (std::isnan(theNull) && std::isnan(theValue)) ||
           (theNull - sTolerance <= theValue && theValue <= theNull + sTolerance);
  };
  theValid = !(aIsNull(theCell[0]) && aIsNull(theCell[1]));
  return theValid ? std::complex<double>(theCell[0] * theRealScale, theCell[1] * theImagScale)
                  : std::complex<double>(theNull, theNull);
}

template <typename T>
void expectComplexLine(CRasterFile &theFile, const TGrid &theGrid, int theRow, int theColStart, int theColEnd,
                       double theNull, double theRealScale, double theImagScale, const std::string &theWhat) {
  const size_t aCount = static_cast<size_t>(theColEnd - theColStart + 1);
  std::vector<std::complex<T>> aLine(aCount);
  std::vector<uint8_t> aValid(aCount, 9);
  theFile.getComplexLine(aLine.data(), theRow, theColStart, theColEnd, aValid.data());
  for (size_t i = 0; i < aCount; ++i) {
    bool aExpectedValid = false;
    const std::complex<double> aExpected = expectedComplex(theGrid[theRow][theColStart + i], theNull, theRealScale,
                                                           theImagScale, aExpectedValid);
    EXPECT_TRUE(sameNumber(aLine[i].real(), static_cast<T>(aExpected.real())) &&
                sameNumber(aLine[i].imag(), static_cast<T>(aExpected.imag())))
        << theWhat << " row " << theRow << " col " << theColStart + i << ": " << aLine[i] << " for " << aExpected;
    EXPECT_EQ(aValid[i], aExpectedValid ? 1 : 0) << theWhat << " row " << theRow << " col " << theColStart + i;
  }
}

} // namespace

// Files composed byte by byte in the test are read as complex lines; writing
// the values read gives the same bytes back.
TEST_F(RasterFileTest, ComplexLinesOfEveryComplexTypeInBothByteOrders) {
  const int aRows = 4;
  const int aCols = 6;
  const std::vector<SRoundTripCase> aCases = {
      {{0, 0, 0}, false, 2.0, 0.5}, {{5, 2, 3}, true, 2.0, 0.5}, {{0, 0, 0}, true, 1.0, 1.0}};
  for (const STypeInfo &aType : sTypes) {
    if (aType.mValues != 2)
      continue;
    for (size_t k = 0; k < aCases.size(); ++k) {
      const SRoundTripCase &aCase = aCases[k];
      // The last case has a NaN null, which only floating parts can hold.
      const bool aNaNNull = k == 2;
      if (aNaNNull && aType.mKind != EKind::kFloat)
        continue;
      const double aNull = aNaNNull ? NAN : 7.0;
      const std::string aWhat = std::string(fdfCellTypeName(aType.mCode)) + " case " + std::to_string(k);
      const TGrid aGrid = makeGrid(aType, aRows, aCols, aNull);
      const std::string aBytes = encodeFile(aGrid, aType, aCase.mMSBF, aCase.mLayout, 0);
      CRasterFileParam aParam = param("cx_" + std::to_string(aType.mCode) + "_" + std::to_string(k) + ".raw",
                                      aType.mCode, aRows, aCols);
      aParam.mHeaderOffset = aCase.mLayout.mHeader;
      aParam.mRowPrefix = aCase.mLayout.mPrefix;
      aParam.mRowSuffix = aCase.mLayout.mSuffix;
      aParam.mMSBF = aCase.mMSBF;
      aParam.mNullCellValue = aNull;
      aParam.mRealScaleFactor = aCase.mRealScale;
      aParam.mImaginaryScaleFactor = aCase.mImagScale;
      tlrxWriteFile(aParam.mFileName, aBytes);

      std::vector<std::vector<std::complex<double>>> aRead(aRows, std::vector<std::complex<double>>(aCols));
      {
        CRasterFile aFile;
        aFile.open_read(aParam);
        for (int r = 0; r < aRows; ++r) {
          expectComplexLine<double>(aFile, aGrid, r, 0, aCols - 1, aNull, aCase.mRealScale, aCase.mImagScale, aWhat);
          expectComplexLine<float>(aFile, aGrid, r, 2, 4, aNull, aCase.mRealScale, aCase.mImagScale, aWhat);
          aFile.getComplexLine(aRead[r].data(), r);
        }
      }
      // In the caller's order when lines and pixels run reversed.
      CRasterFileParam aReversed = aParam;
      aReversed.mLinesReversed = aReversed.mPixelsReversed = true;
      std::vector<std::vector<std::complex<double>>> aReadReversed = aRead;
      {
        CRasterFile aFile;
        aFile.open_read(aReversed);
        for (int r = 0; r < aRows; ++r)
          aFile.getComplexLine(aReadReversed[r].data(), r);
        EXPECT_TRUE(sameNumber(aReadReversed[0][0].imag(), aRead[aRows - 1][aCols - 1].imag())) << aWhat;
        EXPECT_TRUE(sameNumber(aReadReversed[0][aCols - 1].real(), aRead[aRows - 1][0].real())) << aWhat;
      }
      for (const CRasterFileParam *aOut : {&aParam, &aReversed}) {
        CRasterFileParam aWrite = *aOut;
        aWrite.mFileName = mDir.file("cx_out.raw");
        CRasterFile aFile;
        aFile.open_write(aWrite);
        for (int r = 0; r < aRows; ++r)
          aFile.putComplexLine(r, (aOut == &aParam ? aRead : aReadReversed)[r].data());
        aFile.close();
        EXPECT_EQ(bytesOf(tlrxReadFile(aWrite.mFileName)), bytesOf(aBytes)) << aWhat << " written back";
      }
    }
  }
}

TEST_F(RasterFileTest, ComplexWritesRoundSaturateAndStoreNoDataAsTheNull) {
  CRasterFileParam aParam = param("cw.raw", CTLRX_CELL_SHORT_COMPLEX, 1, 5);
  aParam.mMSBF = true;
  aParam.mNullCellValue = -9999.0;
  aParam.mImaginaryScaleFactor = 0.5;
  const std::vector<std::complex<float>> aValues = {
      {1.5f, -1.25f}, {1e6f, -1e6f}, {NAN, 3.0f}, {-9999.0f, -9999.0f}, {-9999.0f, 2.0f}};
  {
    CRasterFile aFile;
    aFile.open_write(aParam);
    aFile.putComplexLine(0, aValues.data());
    aFile.close();
  }
  // Real parts rounded to the nearest (even on ties), imaginary parts
  // divided by 0.5 first; beyond the range saturated; NaN as 0; a no-data
  // value stored unscaled as the null in both parts.
  const STypeInfo aType{CTLRX_CELL_SHORT_COMPLEX, 2, 2, EKind::kSigned};
  const TGrid aExpected = {{{2, -2}, {32767, -32768}, {0, 6}, {-9999, -9999}, {-9999, 4}}};
  EXPECT_EQ(bytesOf(tlrxReadFile(aParam.mFileName)), bytesOf(encodeFile(aExpected, aType, true, {0, 0, 0}, 0)));
}

TEST_F(RasterFileTest, ComplexLinesRefuseRealCellsAndLinesOutside) {
  const std::complex<float> aLine[2] = {};
  for (int32_t aCellType : {CTLRX_CELL_FLOAT, CTLRX_CELL_FLOAT_COMPLEX}) {
    CRasterFile aFile;
    aFile.open_write(param("c" + std::to_string(aCellType), aCellType, 1, 2));
    const int32_t aRow = aCellType == CTLRX_CELL_FLOAT ? 0 : 1;
    expectCode(CTLRX_ERR_FILE_PARSE, [&] { aFile.putComplexLine(aRow, aLine); }, fdfCellTypeName(aCellType));
    aFile.close();
  }
}

// ------------------------------------------------------------ line caches

TEST_F(RasterFileTest, ReadCacheServesItsLinesInBothDirections) {
  // Lines of 256 KiB, as large as the stream buffer: the stream reads them
  // straight into the cache, so what the cache holds is all the object has.
  const int aRows = 10;
  const int aCols = 65536;
  const STypeInfo &aType = sTypes[7];
  const TGrid aGrid = makeGrid(aType, aRows, aCols, -1.0);
  CRasterFileParam aParam = param("cache.raw", CTLRX_CELL_FLOAT, aRows, aCols);
  aParam.mNullCellValue = -1.0;
  const std::string aImage = encodeFile(aGrid, aType, aParam.mMSBF, {0, 0, 0}, 0);
  const auto aExpectedLine = [&](int theFileRow) {
    std::vector<float> aLine;
    for (int c = 0; c < aCols; ++c)
      aLine.push_back(static_cast<float>(expectedValue(aGrid[theFileRow][c], -1.0, 1, 1, false)));
    return aLine;
  };
  for (bool aReversed : {false, true}) {
    tlrxWriteFile(aParam.mFileName, aImage);
    aParam.mLinesReversed = aReversed;
    CRasterFile aFile;
    aFile.open_read(aParam);
    ASSERT_TRUE(aFile.setBuffer(4));
    EXPECT_EQ(aFile.getBufferSize(), 4);
    std::vector<float> aLine(aCols);
    aFile.getLine(aLine.data(), 0);
    expectSameValues(aLine, aExpectedLine(aReversed ? 9 : 0), "first line");
    // With the data gone, the three following lines still come from the cache.
    ASSERT_EQ(truncate(aParam.mFileName.c_str(), 0), 0);
    for (int r = 1; r < 4; ++r) {
      aFile.getLine(aLine.data(), r);
      expectSameValues(aLine, aExpectedLine(aReversed ? 9 - r : r), "cached line " + std::to_string(r));
    }
    // The next line needs a refill, which finds the file short.
    expectCode(CTLRX_ERR_FILE_READ, [&] { aFile.getLine(aLine.data(), 4); }, "refill of a truncated file");
  }
  // Without a cache the very next line is read from the file.
  tlrxWriteFile(aParam.mFileName, aImage);
  aParam.mLinesReversed = false;
  CRasterFile aFile;
  aFile.open_read(aParam);
  std::vector<float> aLine(aCols);
  aFile.getLine(aLine.data(), 0);
  ASSERT_EQ(truncate(aParam.mFileName.c_str(), 0), 0);
  expectCode(CTLRX_ERR_FILE_READ, [&] { aFile.getLine(aLine.data(), 1); });
}

TEST_F(RasterFileTest, ReadCacheRefillsWhenTheColumnsChange) {
  const STypeInfo &aType = sTypes[4]; // SHORT
  const TGrid aGrid = makeGrid(aType, 6, 9, 7.0);
  CRasterFileParam aParam = param("cols.raw", CTLRX_CELL_SHORT, 6, 9);
  aParam.mNullCellValue = 7.0;
  aParam.mRowPrefix = 2;
  tlrxWriteFile(aParam.mFileName, encodeFile(aGrid, aType, aParam.mMSBF, {0, 2, 0}, 0));
  CRasterFile aFile;
  aFile.open_read(aParam);
  ASSERT_TRUE(aFile.setBuffer(3));
  std::vector<double> aLine(9);
  aFile.getLine(aLine.data(), 1, 2, 4);
  aFile.getLine(aLine.data(), 2, 0, 8); // another window on a cached line
  for (int c = 0; c < 9; ++c)
    EXPECT_EQ(aLine[c], expectedValue(aGrid[2][c], 7.0, 1, 1, false)) << c;
}

TEST_F(RasterFileTest, WriteCacheQueuesLinesUntilFullOrClosed) {
  const int aRows = 7;
  const int aCols = 5;
  const STypeInfo &aType = sTypes[8]; // FLOAT_COMPLEX
  const TGrid aGrid = makeGrid(aType, aRows, aCols, 7.0);
  CRasterFileParam aParam = param("wcache.raw", CTLRX_CELL_FLOAT_COMPLEX, aRows, aCols);
  aParam.mMSBF = true;
  aParam.mRowSuffix = 4;
  CRasterFile aFile;
  aFile.open_write(aParam);
  ASSERT_TRUE(aFile.setBuffer(3));
  const int aOrder[aRows] = {6, 0, 2, 1, 3, 5, 4};
  for (int i = 0; i < 2; ++i)
    aFile.putLine(aOrder[i], encodeCells(aGrid, aType, machineIsMSBF(), aOrder[i], 0, aCols - 1).data());
  struct stat aStat;
  ASSERT_EQ(stat(aParam.mFileName.c_str(), &aStat), 0);
  EXPECT_EQ(aStat.st_size, 0) << "queued lines are not written yet";
  for (int i = 2; i < aRows; ++i) {
    const std::vector<uint8_t> aCells = encodeCells(aGrid, aType, machineIsMSBF(), aOrder[i], 0, aCols - 1);
    std::memcpy(aFile.getLineBuffer(aOrder[i]), aCells.data(), aCells.size());
    aFile.putLine(aOrder[i]);
  }
  aFile.close(); // writes the last queued lines
  EXPECT_EQ(bytesOf(tlrxReadFile(aParam.mFileName)), bytesOf(encodeFile(aGrid, aType, true, {0, 0, 4}, 0)));
}

TEST_F(RasterFileTest, CacheOnlyInReadOrWriteMode) {
  CRasterFile aFile;
  EXPECT_FALSE(aFile.setBuffer(4));
  CRasterFileParam aParam = param("u.raw", CTLRX_CELL_BYTE, 3, 3);
  aFile.open_read_write(aParam);
  EXPECT_FALSE(aFile.setBuffer(4));
  aFile.close();
}

// ------------------------------------------------------- update in place

TEST_F(RasterFileTest, UpdateWritesOnlyTheCellsAndKeepsPrefixesAndOtherColumns) {
  const STypeInfo &aType = sTypes[4]; // SHORT
  TGrid aGrid = makeGrid(aType, 4, 6, 7.0);
  CRasterFileParam aParam = param("upd.raw", CTLRX_CELL_SHORT, 4, 6);
  aParam.mRowPrefix = 3;
  aParam.mRowSuffix = 1;
  aParam.mHeaderOffset = 5;
  aParam.mMSBF = true;
  tlrxWriteFile(aParam.mFileName, encodeFile(aGrid, aType, true, {5, 3, 1}, 0xEE));
  CRasterFile aFile;
  aFile.open_read_write(aParam);
  std::vector<double> aLine(6);
  aFile.getLine(aLine.data(), 0);
  // Write columns 2..3 of line 1, then read line 2 right after it, then
  // write line 2 whole, then read line 3: the stream must follow each switch.
  const std::vector<int16_t> aWindow = {1000, -1000};
  aFile.writeRecords(1, 1, aWindow.data(), 2, 3);
  aGrid[1][2] = {1000};
  aGrid[1][3] = {-1000};
  aFile.getLine(aLine.data(), 2);
  for (int c = 0; c < 6; ++c)
    EXPECT_EQ(aLine[c], expectedValue(aGrid[2][c], 7.0, 1, 1, false)) << c;
  std::vector<int16_t> aWhole = {1, 2, 3, 4, 5, 6};
  const std::vector<int16_t> aWholeCopy = aWhole;
  aFile.writeRecords(2, 1, aWhole.data());
  EXPECT_EQ(aWhole, aWholeCopy);
  for (int c = 0; c < 6; ++c)
    aGrid[2][c] = {static_cast<double>(c + 1)};
  aFile.getLine(aLine.data(), 3);
  for (int c = 0; c < 6; ++c)
    EXPECT_EQ(aLine[c], expectedValue(aGrid[3][c], 7.0, 1, 1, false)) << c;
  aFile.close();
  EXPECT_EQ(bytesOf(tlrxReadFile(aParam.mFileName)), bytesOf(encodeFile(aGrid, aType, true, {5, 3, 1}, 0xEE)));
}

TEST_F(RasterFileTest, UpdateCreatesAMissingFile) {
  CRasterFileParam aParam = param("new_update.raw", CTLRX_CELL_UNSIGNED_BYTE, 2, 3);
  CRasterFile aFile;
  aFile.open_read_write(aParam);
  const uint8_t aCells[3] = {9, 8, 7};
  aFile.writeRecords(1, 1, aCells);
  aFile.close();
  EXPECT_EQ(tlrxReadFile(aParam.mFileName), std::string("\0\0\0\x09\x08\x07", 6));
}

TEST_F(RasterFileTest, WriteModeColumnWindowsKeepEachOthersCells) {
  CRasterFileParam aParam = param("win.raw", CTLRX_CELL_UNSIGNED_BYTE, 3, 4);
  aParam.mRowPrefix = 1;
  aParam.mRowSuffix = 1;
  CRasterFile aFile;
  aFile.open_write(aParam);
  const uint8_t aA[2] = {1, 2};
  const uint8_t aB[2] = {3, 4};
  const uint8_t aC[4] = {5, 6, 7, 8};
  aFile.writeRecords(2, 1, aA, 0, 1);
  aFile.writeRecords(0, 1, aC);
  aFile.writeRecords(2, 1, aB, 2, 3);
  aFile.close(); // line 1 never written: padded
  EXPECT_EQ(tlrxReadFile(aParam.mFileName), std::string("\0\x05\x06\x07\x08\0"
                                                         "\0\0\0\0\0\0"
                                                         "\0\x01\x02\x03\x04\0",
                                                         18));
}

// --------------------------------------------------------------- closing

TEST_F(RasterFileTest, ClosingPadsLinesNeverWrittenWithAWarning) {
  CRasterFileParam aParam = param("pad.raw", CTLRX_CELL_SHORT, 100, 3);
  aParam.mRowPrefix = 2;
  const int32_t aWarnings = fdfGetWarningCount();
  CRasterFile aFile;
  aFile.open_write(aParam);
  const int16_t aCells[3] = {0x0101, 0x0202, 0x0303};
  for (int r = 0; r < 60; ++r)
    aFile.writeRecords(r, 1, aCells);
  startTrace();
  aFile.close();
  const std::string aTrace = traceText();
  EXPECT_NE(aTrace.find("\nWARNING NULL line writed : 40 in file : " + aParam.mFileName), std::string::npos);
  EXPECT_EQ(fdfGetWarningCount(), aWarnings + 1);
  const std::string aData = tlrxReadFile(aParam.mFileName);
  ASSERT_EQ(aData.size(), 100u * 8u);
  EXPECT_EQ(aData.substr(59 * 8, 8), std::string("\0\0\x01\x01\x02\x02\x03\x03", 8));
  EXPECT_EQ(aData.substr(60 * 8), std::string(40 * 8, '\0'));
  const std::string aLog = tlrxReadFile(mDir.file("Process.log"));
  EXPECT_NE(aLog.find("[ERROR ID : 130561]"), std::string::npos);
  EXPECT_NE(aLog.find(aParam.mFileName), std::string::npos);
}

TEST_F(RasterFileTest, DestructorClosesAnOpenFile) {
  CRasterFileParam aParam = param("dtor.raw", CTLRX_CELL_INT, 4, 2);
  {
    CRasterFile aFile;
    aFile.open_write(aParam);
    const int32_t aCells[2] = {-1, 1};
    aFile.setBuffer(2);
    aFile.putLine(0, aCells);
  }
  const std::string aData = tlrxReadFile(aParam.mFileName);
  ASSERT_EQ(aData.size(), 32u);
  EXPECT_EQ(aData.substr(0, 4), std::string("\xff\xff\xff\xff", 4));
  EXPECT_EQ(aData.substr(8), std::string(24, '\0'));
}

TEST_F(RasterFileTest, ClosedObjectsCanBeReopened) {
  CRasterFileParam aParam = param("re.raw", CTLRX_CELL_FLOAT, 2, 2);
  CRasterFile aFile;
  aFile.open_write(aParam);
  const float aCells[4] = {1, 2, 3, 4};
  aFile.writeRecords(0, 2, aCells);
  aFile.close();
  aFile.open_read(aParam);
  std::vector<float> aLine(2);
  aFile.getLine(aLine.data(), 1);
  EXPECT_EQ(aLine, (std::vector<float>{3, 4}));
  aFile.close();
  expectCode(CTLRX_ERR_FILE_PARSE, [&] { aFile.close(); }, "second close");
}

// ------------------------------------------------------------- clamping

TEST_F(RasterFileTest, OutOfRangeRecordsAreClampedNeverOverrun) {
  CRasterFileParam aParam = param("clamp.raw", CTLRX_CELL_UNSIGNED_SHORT, 10, 1000);
  std::vector<uint16_t> aAll(10 * 1000);
  for (size_t i = 0; i < aAll.size(); ++i)
    aAll[i] = static_cast<uint16_t>(i * 7);
  tlrxWriteFile(aParam.mFileName, std::string(reinterpret_cast<const char *>(aAll.data()), aAll.size() * 2));
  CRasterFile aFile;
  aFile.open_read(aParam);
  startTrace();
  std::vector<uint16_t> aLine(1000, 0xBEEF);
  EXPECT_EQ(aFile.readRecords(-3, 1, 0, 999, aLine.data()), 1);
  EXPECT_TRUE(std::equal(aLine.begin(), aLine.end(), aAll.begin())) << "line -3 reads line 0";
  std::fill(aLine.begin(), aLine.end(), 0xBEEF);
  aFile.readRecords(4, 1, 5, 2000, aLine.data());
  EXPECT_TRUE(std::equal(aLine.begin(), aLine.begin() + 995, aAll.begin() + 4005)) << "columns 5 to 999";
  EXPECT_EQ(aLine[995], 0xBEEF) << "nothing beyond the clamped columns";
  // A block that runs past the last line delivers only the lines that exist.
  std::vector<uint16_t> aBlock(5 * 1000, 0xBEEF);
  EXPECT_EQ(aFile.readRecords(8, 5, 0, 999, aBlock.data()), 2);
  EXPECT_TRUE(std::equal(aBlock.begin(), aBlock.begin() + 2000, aAll.begin() + 8000));
  EXPECT_EQ(aBlock[2000], 0xBEEF);
  const std::string aTrace = traceText();
  EXPECT_NE(aTrace.find("Requested line -3 is outside the image!\n"), std::string::npos);
  EXPECT_NE(aTrace.find("Requested column 2000 is outside the image!\n"), std::string::npos);
  EXPECT_NE(aTrace.find("Requested line 12 is outside the image!\n"), std::string::npos);
}

TEST_F(RasterFileTest, WritesOutsideTheImageAreClamped) {
  CRasterFileParam aParam = param("wclamp.raw", CTLRX_CELL_BYTE, 3, 2);
  CRasterFile aFile;
  aFile.open_write(aParam);
  const int8_t aCells[2] = {5, 6};
  EXPECT_EQ(aFile.writeRecords(12, 1, aCells), 1);
  aFile.close();
  EXPECT_EQ(tlrxReadFile(aParam.mFileName), std::string("\0\0\0\0\x05\x06", 6));
}

// ----------------------------------------------------- 64-bit positions

TEST_F(RasterFileTest, SparseFileBeyondFourGigabytes) {
  const int32_t aRows = 45000;
  const int32_t aCols = 25000; // FLOAT: 100000-byte records, 4.5e9 bytes in all
  CRasterFileParam aParam = param("big.raw", CTLRX_CELL_FLOAT, aRows, aCols);
  aParam.mHeaderOffset = 13;
  const int64_t aRecord = 4LL * aCols;
  const int64_t aSize = 13 + aRecord * aRows;
  ASSERT_GT(aSize, 4LL * 1024 * 1024 * 1024);
  std::vector<float> aLast(aCols);
  for (int c = 0; c < aCols; ++c)
    aLast[c] = static_cast<float>(c) * 0.5f;
  {
    const int aFd = open(aParam.mFileName.c_str(), O_CREAT | O_WRONLY | O_TRUNC, 0644);
    ASSERT_GE(aFd, 0);
    ASSERT_EQ(ftruncate(aFd, aSize), 0);
    ASSERT_EQ(pwrite(aFd, aLast.data(), aRecord, 13 + aRecord * (aRows - 1)), aRecord);
    close(aFd);
  }
  {
    CRasterFile aFile;
    aFile.open_read(aParam);
    std::vector<float> aLine(aCols, -1.0f);
    aFile.getLine(aLine.data(), aRows - 1);
    EXPECT_EQ(aLine, aLast);
    aFile.getLine(aLine.data(), 0);
    EXPECT_EQ(aLine, std::vector<float>(aCols, 0.0f));
    aFile.getLine(aLine.data(), aRows - 1, 20000, 24999);
    EXPECT_TRUE(std::equal(aLine.begin(), aLine.begin() + 5000, aLast.begin() + 20000));
  }
  // Written beyond 4 GB, with holes before: no padding is needed.
  CRasterFileParam aOut = param("big_out.raw", CTLRX_CELL_FLOAT, aRows, aCols);
  aOut.mRowPrefix = 8;
  const int32_t aWarnings = fdfGetWarningCount();
  {
    CRasterFile aFile;
    aFile.open_write(aOut);
    aFile.writeRecords(30000, 1, aLast.data());
    aFile.writeRecords(aRows - 1, 1, aLast.data());
    aFile.close();
  }
  EXPECT_EQ(fdfGetWarningCount(), aWarnings);
  struct stat aStat;
  ASSERT_EQ(stat(aOut.mFileName.c_str(), &aStat), 0);
  EXPECT_EQ(aStat.st_size, static_cast<off_t>((aRecord + 8) * aRows));
  {
    CRasterFile aFile;
    aFile.open_read_write(aOut);
    const float aPatch[2] = {-1.0f, -2.0f};
    aFile.writeRecords(aRows - 2, 1, aPatch, 100, 101);
    std::vector<float> aLine(aCols);
    for (int32_t aRow : {aRows - 1, 30000}) {
      aFile.getLine(aLine.data(), aRow);
      EXPECT_EQ(aLine, aLast) << aRow;
    }
    aFile.getLine(aLine.data(), aRows - 2, 99, 102);
    EXPECT_EQ(std::vector<float>(aLine.begin(), aLine.begin() + 4), (std::vector<float>{0, -1, -2, 0}));
    aFile.close();
  }
  unlink(aParam.mFileName.c_str());
  unlink(aOut.mFileName.c_str());
}

// ---------------------------------------------------------- header files

TEST_F(RasterFileTest, ParametersComeFromTheHeaderWithDefaults) {
  CDescription aHeader;
  fdfDeclareStandardHeader(aHeader);
  aHeader.getField("RasterInfo.NrOfLinesPerImage").setInteger(12);
  aHeader.getField("RasterInfo.NrOfPixelsPerLine").setInteger(34);
  aHeader.getField("RasterInfo.CellType").setString("SHORT_COMPLEX");
  CRasterFileParam aParam;
  aParam.setFromDescription("data.raw", aHeader);
  EXPECT_EQ(aParam.mFileName, "data.raw");
  EXPECT_EQ(aParam.mNrOfLinesPerImage, 12);
  EXPECT_EQ(aParam.mNrOfPixelsPerLine, 34);
  EXPECT_EQ(aParam.mCellType, CTLRX_CELL_SHORT_COMPLEX);
  EXPECT_EQ(aParam.mDataUnits, CTLRX_UNITS_UNKNOWN);
  EXPECT_EQ(aParam.mHeaderOffset, 0);
  EXPECT_EQ(aParam.mRowPrefix, 0);
  EXPECT_EQ(aParam.mRowSuffix, 0);
  EXPECT_EQ(aParam.mFooterLen, 0);
  EXPECT_EQ(aParam.mNullCellValue, 0.0);
  EXPECT_EQ(aParam.mNrOfChannels, 1);
  EXPECT_EQ(aParam.mRealScaleFactor, 1.0);
  EXPECT_EQ(aParam.mImaginaryScaleFactor, 1.0);
  EXPECT_EQ(aParam.mMSBF, machineIsMSBF());
  for (const auto &aOrder : std::vector<std::pair<const char *, bool>>{{"MSBF", true}, {"LSBF", false},
                                                                       {"msbf", false}, {"BIG", false}}) {
    aHeader.getField("RasterInfo.BytesOrder").setString(aOrder.first);
    aParam.setFromDescription("data.raw", aHeader);
    EXPECT_EQ(aParam.mMSBF, aOrder.second) << aOrder.first;
  }
  aHeader.getField("RasterInfo.CellType").setString("float");
  aHeader.getField("RasterInfo.DataUnits").setString("COHERENCE");
  aParam.setFromDescription("data.raw", aHeader);
  EXPECT_EQ(aParam.mCellType, CTLRX_CELL_UNKNOWN);
  EXPECT_EQ(aParam.mDataUnits, CTLRX_UNITS_COHERENCE);
}

TEST_F(RasterFileTest, LayoutRoundTripsThroughAHeaderFile) {
  CRasterFileParam aParam = param("hdr.raw", CTLRX_CELL_UNSIGNED_SHORT_COMPLEX, 3, 4);
  aParam.mDataUnits = CTLRX_UNITS_SLC;
  aParam.mHeaderOffset = 10;
  aParam.mRowPrefix = 2;
  aParam.mRowSuffix = 6;
  aParam.mFooterLen = 3;
  aParam.mNullCellValue = -9999.5;
  aParam.mMSBF = !machineIsMSBF();
  aParam.mNrOfChannels = 2;
  aParam.mRealScaleFactor = 0.25;
  aParam.mImaginaryScaleFactor = 4.0;
  CDescription aHeader;
  fdfDeclareStandardHeader(aHeader);
  aParam.storeInDescription(aHeader);
  ASSERT_TRUE(fdfWriteStandardHeader(aParam.mFileName.c_str(), aHeader, true));

  CRasterFileParam aRead;
  aRead.readFromHeader(aParam.mFileName.c_str());
  EXPECT_EQ(aRead.mFileName, aParam.mFileName);
  EXPECT_EQ(aRead.mCellType, aParam.mCellType);
  EXPECT_EQ(aRead.mDataUnits, aParam.mDataUnits);
  EXPECT_EQ(aRead.mNrOfLinesPerImage, 3);
  EXPECT_EQ(aRead.mNrOfPixelsPerLine, 4);
  EXPECT_EQ(aRead.mHeaderOffset, 10);
  EXPECT_EQ(aRead.mRowPrefix, 2);
  EXPECT_EQ(aRead.mRowSuffix, 6);
  EXPECT_EQ(aRead.mFooterLen, 3);
  EXPECT_EQ(aRead.mNullCellValue, -9999.5);
  EXPECT_EQ(aRead.mMSBF, aParam.mMSBF);
  EXPECT_EQ(aRead.mNrOfChannels, 2);
  EXPECT_EQ(aRead.mRealScaleFactor, 0.25);
  EXPECT_EQ(aRead.mImaginaryScaleFactor, 4.0);

  // Write by name (the header exists), then read by name and through the
  // loaded description.
  const std::vector<uint16_t> aCells = {1, 2, 3, 4, 5, 6, 7, 8};
  {
    CRasterFile aFile;
    aFile.open_write(aParam.mFileName.c_str());
    EXPECT_TRUE(aFile.isSwapped());
    for (int r = 0; r < 3; ++r)
      aFile.writeRecords(r, 1, aCells.data());
    aFile.close();
  }
  EXPECT_EQ(tlrxReadFile(aParam.mFileName).size(), 10u + 3u * (2u + 16u + 6u));
  for (int aForm = 0; aForm < 2; ++aForm) {
    CRasterFile aFile;
    if (aForm == 0)
      aFile.open_read(aParam.mFileName.c_str());
    else
      aFile.open_read(aParam.mFileName.c_str(), aHeader);
    EXPECT_EQ(aFile.getDataUnits(), CTLRX_UNITS_SLC);
    EXPECT_EQ(aFile.getDataNbr(), 2);
    EXPECT_EQ(aFile.getDummyVal(), -9999.5);
    std::vector<double> aLine(4);
    aFile.getLine(aLine.data(), 2, 0, -1, true);
    for (int c = 0; c < 4; ++c) {
      const double aRe = aCells[2 * c] * 0.25;
      const double aIm = aCells[2 * c + 1] * 4.0;
      EXPECT_DOUBLE_EQ(aLine[c], std::sqrt(aRe * aRe + aIm * aIm)) << aForm << " " << c;
    }
  }
}

// ------------------------------------------------------------- bad input

TEST_F(RasterFileTest, SizesOutsideTheLimitAreRefused) {
  const std::vector<std::pair<int32_t, int32_t>> aSizes = {{0, 5}, {5, 0}, {-1, 5}, {900001, 1}, {1, 900001}};
  for (const auto &aSize : aSizes) {
    for (int32_t aMode : {CTLRX_RF_OPEN_READ, CTLRX_RF_OPEN_WRITE, CTLRX_RF_OPEN_READ_WRITE}) {
      CRasterFileParam aParam = param("size.raw", CTLRX_CELL_FLOAT, aSize.first, aSize.second);
      tlrxWriteFile(aParam.mFileName, "keep");
      CRasterFile aFile;
      expectCode(CTLRX_ERR_FILE_PARSE, [&] {
        if (aMode == CTLRX_RF_OPEN_READ)
          aFile.open_read(aParam);
        else if (aMode == CTLRX_RF_OPEN_WRITE)
          aFile.open_write(aParam);
        else
          aFile.open_read_write(aParam);
      }, std::to_string(aSize.first) + "x" + std::to_string(aSize.second));
      EXPECT_EQ(aFile.getRasterStatus(), CTLRX_RF_CLOSE);
      EXPECT_EQ(tlrxReadFile(aParam.mFileName), "keep") << "a refused layout leaves the file alone";
    }
  }
  // The limit itself is accepted.
  CRasterFileParam aParam = param("limit.raw", CTLRX_CELL_BYTE, CTLRX_RASTER_FILE_MAX_ROWS, 1);
  CRasterFile aFile;
  aFile.open_write(aParam);
  EXPECT_EQ(aFile.getNrOfLinesPerImage(), 900000);
  aFile.close();
  EXPECT_EQ(tlrxReadFile(aParam.mFileName).size(), 900000u);
}

TEST_F(RasterFileTest, UnknownCellTypesAndNegativeLayoutsAreRefused) {
  for (int32_t aType : {-1, 15, 1000}) {
    CRasterFile aFile;
    expectCode(CTLRX_ERR_FILE_PARSE, [&] { aFile.open_write(param("t.raw", aType, 2, 2)); }, std::to_string(aType));
  }
  CRasterFileParam aParam = param("neg.raw", CTLRX_CELL_FLOAT, 2, 2);
  tlrxWriteFile(aParam.mFileName, std::string(64, '\0'));
  for (int aField = 0; aField < 4; ++aField) {
    CRasterFileParam aBad = aParam;
    (aField == 0 ? aBad.mHeaderOffset : aField == 1 ? aBad.mRowPrefix : aField == 2 ? aBad.mRowSuffix : aBad.mFooterLen) =
        -4;
    CRasterFile aFile;
    expectCode(CTLRX_ERR_FILE_PARSE, [&] { aFile.open_read(aBad); }, "negative field " + std::to_string(aField));
  }
  // Records longer than 2^31 - 1 bytes cannot be addressed by the layout.
  CRasterFileParam aLong = aParam;
  aLong.mRowPrefix = 2147483000;
  aLong.mRowSuffix = 1000;
  CRasterFile aLongFile;
  expectCode(CTLRX_ERR_FILE_PARSE, [&] { aLongFile.open_write(aLong); }, "record too long");
  // A header naming a cell type outside the vocabulary.
  CDescription aHeader;
  fdfDeclareStandardHeader(aHeader);
  aHeader.getField("RasterInfo.NrOfLinesPerImage").setInteger(2);
  aHeader.getField("RasterInfo.NrOfPixelsPerLine").setInteger(2);
  aHeader.getField("RasterInfo.CellType").setString("float");
  CRasterFile aFile;
  expectCode(CTLRX_ERR_FILE_PARSE, [&] { aFile.open_read(aParam.mFileName.c_str(), aHeader); });
}

TEST_F(RasterFileTest, FilesShorterThanTheirHeaderAreNeverReadAsZeros) {
  CRasterFileParam aParam = param("short.raw", CTLRX_CELL_FLOAT, 4, 4);
  const std::string aFull(64, '\x11');
  struct SCase {
    int32_t mHeader;
    int32_t mPrefix;
    size_t mBytes;
  };
  for (const SCase &aCase : std::vector<SCase>{{0, 0, 63},           // one byte short
                                               {100, 0, 64},         // header offset beyond the end
                                               {0, 1000, 64},        // prefix beyond the end
                                               {2000000000, 0, 64},  // offset far beyond the end
                                               {0, 2000000000, 64},  // refused before a 2 GB record buffer
                                               {0, 0, 0}}) {         // empty file
    CRasterFileParam aBad = aParam;
    aBad.mHeaderOffset = aCase.mHeader;
    aBad.mRowPrefix = aCase.mPrefix;
    tlrxWriteFile(aBad.mFileName, aFull.substr(0, aCase.mBytes));
    CRasterFile aFile;
    expectCode(CTLRX_ERR_FILE_READ, [&] { aFile.open_read(aBad); },
               "header " + std::to_string(aCase.mHeader) + " prefix " + std::to_string(aCase.mPrefix));
    EXPECT_EQ(aFile.getRasterStatus(), CTLRX_RF_CLOSE);
  }
  // A file cut after opening: the short read fails, nothing is filled in.
  tlrxWriteFile(aParam.mFileName, aFull);
  CRasterFile aFile;
  aFile.open_read(aParam);
  ASSERT_EQ(truncate(aParam.mFileName.c_str(), 40), 0);
  std::vector<float> aBlock(16, -5.0f);
  expectCode(CTLRX_ERR_FILE_READ, [&] { aFile.readRecords(0, 4, 0, 3, aBlock.data()); });
  std::vector<float> aLine(4);
  aFile.getLine(aLine.data(), 1); // lines still in the file read normally
  expectCode(CTLRX_ERR_FILE_READ, [&] { aFile.getLine(aLine.data(), 3); });
  // Update mode on a file shorter than the image: reading a missing line fails.
  aFile.close();
  aFile.open_read_write(aParam);
  expectCode(CTLRX_ERR_FILE_READ, [&] { aFile.getLine(aLine.data(), 3); });
}

TEST_F(RasterFileTest, MissingFilesAndUnwritableFolders) {
  CRasterFile aFile;
  expectCode(CTLRX_ERR_FILE_OPEN, [&] { aFile.open_read(param("absent.raw", CTLRX_CELL_FLOAT, 2, 2)); });
  expectCode(CTLRX_ERR_FILE_OPEN, [&] { aFile.open_read(mDir.file("absent.raw").c_str()); }, "no header");
  CRasterFileParam aDirectory = param("", CTLRX_CELL_FLOAT, 1, 1);
  aDirectory.mFileName = mDir.path();
  expectCode(CTLRX_ERR_FILE_OPEN, [&] { aFile.open_read(aDirectory); }, "a folder");
  const std::string aMissingFolder = mDir.file("no/such/folder/out.raw");
  for (bool aUpdate : {false, true}) {
    CRasterFileParam aParam = param("", CTLRX_CELL_FLOAT, 2, 2);
    aParam.mFileName = aMissingFolder;
    expectCode(CTLRX_ERR_FILE_WRITE, [&] { aUpdate ? aFile.open_read_write(aParam) : aFile.open_write(aParam); });
    EXPECT_EQ(aFile.getRasterStatus(), CTLRX_RF_CLOSE);
  }
  // A folder that refuses new files (permissions for ordinary users; /proc
  // refuses even the superuser).
  const std::string aLocked = mDir.file("locked");
  ASSERT_EQ(mkdir(aLocked.c_str(), 0555), 0);
  CRasterFileParam aParam = param("", CTLRX_CELL_FLOAT, 2, 2);
  aParam.mFileName = geteuid() == 0 ? std::string("/proc/tlrx_raster_test.raw") : aLocked + "/out.raw";
  expectCode(CTLRX_ERR_FILE_WRITE, [&] { aFile.open_write(aParam); }, aParam.mFileName);
  expectCode(CTLRX_ERR_FILE_WRITE, [&] { aFile.open_read_write(aParam); }, aParam.mFileName);
  chmod(aLocked.c_str(), 0755);
  // Writing needs a name.
  CRasterFileParam aNameless = param("", CTLRX_CELL_FLOAT, 2, 2);
  aNameless.mFileName.clear();
  expectCode(CTLRX_ERR_FILE_PARSE, [&] { aFile.open_write(aNameless); });
  expectCode(CTLRX_ERR_FILE_PARSE, [&] { aFile.open_read_write(aNameless); });
}

TEST_F(RasterFileTest, ModesRefuseWhatTheyDoNotAllow) {
  CRasterFileParam aParam = param("modes.raw", CTLRX_CELL_FLOAT, 2, 3);
  tlrxWriteFile(aParam.mFileName, std::string(24, '\0'));
  float aCells[6] = {0};
  CRasterFile aClosed;
  expectCode(CTLRX_ERR_FILE_READ, [&] { aClosed.readRecords(0, 1, 0, 2, aCells); }, "read when closed");
  expectCode(CTLRX_ERR_FILE_WRITE, [&] { aClosed.writeRecords(0, 1, aCells); }, "write when closed");
  expectCode(CTLRX_ERR_FILE_READ, [&] { aClosed.getLineBuffer(0); }, "line buffer when closed");
  expectCode(CTLRX_ERR_FILE_READ, [&] { aClosed.getLine(aCells, 0); }, "getLine when closed");
  expectCode(CTLRX_ERR_FILE_WRITE, [&] { aClosed.putLine(0); }, "putLine when closed");
  EXPECT_FALSE(aClosed.seekLinePosition(0));

  CRasterFile aReader;
  aReader.open_read(aParam);
  expectCode(CTLRX_ERR_FILE_WRITE, [&] { aReader.writeRecords(0, 1, aCells); }, "write in read mode");
  expectCode(CTLRX_ERR_FILE_WRITE, [&] { aReader.putLine(0, aCells); }, "putLine in read mode");
  expectCode(CTLRX_ERR_FILE_READ, [&] { aReader.readRecords(0, 0, 0, 2, aCells); }, "no lines");
  expectCode(CTLRX_ERR_FILE_READ, [&] { aReader.readRecords(0, -2, 0, 2, aCells); }, "negative lines");
  expectCode(CTLRX_ERR_FILE_READ, [&] { aReader.readRecords(0, 1, 2, 1, aCells); }, "columns crossed");
  for (const auto &aColumns : std::vector<std::pair<int, int>>{{2, 1}, {-1, 2}, {0, 3}, {3, 3}})
    expectCode(CTLRX_ERR_FILE_PARSE, [&] { aReader.getLine(aCells, 0, aColumns.first, aColumns.second); },
               "getLine columns " + std::to_string(aColumns.first) + ".." + std::to_string(aColumns.second));
  for (int aRow : {-1, 2})
    expectCode(CTLRX_ERR_FILE_PARSE, [&] { aReader.getLine(aCells, aRow); }, "getLine row " + std::to_string(aRow));

  CRasterFileParam aOut = param("modes_out.raw", CTLRX_CELL_FLOAT, 2, 3);
  CRasterFile aWriter;
  aWriter.open_write(aOut);
  startTrace();
  expectCode(CTLRX_ERR_FILE_READ, [&] { aWriter.readRecords(0, 1, 0, 2, aCells); }, "read in write mode");
  expectCode(CTLRX_ERR_FILE_WRITE, [&] { aReader.writeRecords(0, 1, aCells); }, "write in read mode");
  const std::string aTrace = traceText();
  EXPECT_NE(aTrace.find("Error: attempting to read from the raster file " + aOut.mFileName +
                        " while it was open in write mode\n"),
            std::string::npos);
  EXPECT_NE(aTrace.find("Error: attempting to write to the raster file " + aParam.mFileName +
                        " while it was open in read mode\n"),
            std::string::npos);
  expectCode(CTLRX_ERR_FILE_READ, [&] { aWriter.getLine(aCells, 0); }, "getLine in write mode");
  expectCode(CTLRX_ERR_FILE_WRITE, [&] { aWriter.writeRecords(0, 0, aCells); }, "no lines");
  expectCode(CTLRX_ERR_FILE_WRITE, [&] { aWriter.writeRecords(0, 1, aCells, 2, 1); }, "columns crossed");
  aWriter.writeRecords(0, 2, aCells);
  aWriter.close();
}

TEST_F(RasterFileTest, OpeningAnOpenObjectIsRefusedForEveryMode) {
  CRasterFileParam aParam = param("open.raw", CTLRX_CELL_FLOAT, 2, 3);
  tlrxWriteFile(aParam.mFileName, std::string(24, '\x01'));
  CRasterFile aFile;
  aFile.open_read(aParam);
  startTrace();
  CRasterFileParam aOther = param("other.raw", CTLRX_CELL_FLOAT, 2, 3);
  expectCode(CTLRX_ERR_FILE_PARSE, [&] { aFile.open_write(aOther); }, "write");
  expectCode(CTLRX_ERR_FILE_PARSE, [&] { aFile.open_read_write(aOther); }, "update");
  expectCode(CTLRX_ERR_FILE_PARSE, [&] { aFile.open_read(aParam); }, "read");
  expectCode(CTLRX_ERR_FILE_PARSE, [&] { aFile.open_write(aOther.mFileName.c_str()); }, "write by name");
  const std::string aTrace = traceText();
  EXPECT_NE(aTrace.find("Error: attempting to open the raster file " + aOther.mFileName +
                        " in input mode while it was not closed\n"),
            std::string::npos);
  EXPECT_FALSE(tlrxFileExists(aOther.mFileName)) << "the second file is never touched";
  EXPECT_EQ(aFile.getRasterStatus(), CTLRX_RF_OPEN_READ) << "the open file stays open";
  std::vector<float> aLine(3);
  aFile.getLine(aLine.data(), 1);
  EXPECT_EQ(aLine[0], aLine[1]);
}

TEST_F(RasterFileTest, PrintShowsTheState) {
  CRasterFileParam aParam = param("print.raw", CTLRX_CELL_SHORT, 2, 3);
  aParam.mMSBF = !machineIsMSBF();
  aParam.mLinesReversed = true;
  aParam.mDataUnits = CTLRX_UNITS_RATIO;
  tlrxWriteFile(aParam.mFileName, std::string(12, '\0'));
  CRasterFile aFile;
  aFile.open_read(aParam);
  startTrace();
  aFile.print("LABEL ");
  aFile.close();
  aFile.print("AFTER ");
  const std::string aTrace = traceText();
  for (const char *aPart :
       {"\n\n ********************** LABEL - RASTER FILE IN READ MODE **********************", " CellType       = SHORT\n",
        " mDataUnits     = RATIO\n", " mRecordLen     = 6\n", " mBytesPerPixel = 2\n", " mDataNbr       = 1\n",
        " NrOfPixelsPerLine   = 3\n", " NrOfLinesPerImage   = 2\n", "Lines time direction : DECREASE\n",
        "Pixels time direction : INCREASE\n", " Swap DATA\n", "AFTER - RASTER FILE CLOSE **********************\n\n",
        " this           = "})
    EXPECT_NE(aTrace.find(aPart), std::string::npos) << aPart;
}
