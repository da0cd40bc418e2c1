// Raster file: every cell type and layout against an independent encoder,
// typed access, caches, 64-bit positions, closing, and bad input with its code.
#include <gtest/gtest.h>
#include <cmath>
#include <complex>
#include <cstring>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>
#include "tlrx_command_test_support.h"
#include "tlrx_description_section.h"
#include "tlrx_enviroment.h"
#include "tlrx_raster_file.h"
#include "tlrx_standard_header.h"
#include "tlrx_trace_test_support.h"

namespace {

constexpr double sTolerance = 1.1754943508222875e-38;

bool machineIsMSBF() {
  const uint16_t aProbe = 1;
  return *reinterpret_cast<const uint8_t *>(&aProbe) == 0;
}

enum class EKind { kSigned, kUnsigned, kFloat, kBit };

// Storage of each cell type, written out independently of the library.
struct STypeInfo {
  int32_t mCode;
  int mComponentBytes, mValues;
  EKind mKind;
};

const std::vector<STypeInfo> sTypes = {
    {0, 1, 1, EKind::kSigned},   {1, 1, 2, EKind::kSigned},   {2, 1, 1, EKind::kUnsigned},
    {3, 1, 2, EKind::kUnsigned}, {4, 2, 1, EKind::kSigned},   {5, 2, 1, EKind::kUnsigned},
    {6, 2, 2, EKind::kSigned},   {7, 4, 1, EKind::kFloat},    {8, 4, 2, EKind::kFloat},
    {9, 8, 1, EKind::kFloat},    {10, 8, 2, EKind::kFloat},   {11, 4, 1, EKind::kUnsigned},
    {12, 4, 1, EKind::kSigned},  {14, 2, 2, EKind::kUnsigned},
};
const STypeInfo &sShort = sTypes[4], &sFloat = sTypes[7], &sFloatComplex = sTypes[8];

// One component in the given byte order, whatever the machine's.
void encodeComponent(double theValue, const STypeInfo &theType, bool theMSBF, uint8_t *theOut) {
  uint64_t aBits = theType.mKind == EKind::kSigned ? static_cast<uint64_t>(static_cast<int64_t>(theValue)) : 0;
  if (theType.mKind == EKind::kUnsigned) {
    aBits = static_cast<uint64_t>(theValue);
  } else if (theType.mKind == EKind::kFloat && theType.mComponentBytes == 8) {
    std::memcpy(&aBits, &theValue, 8);
  } else if (theType.mKind == EKind::kFloat) {
    const float aSingle = static_cast<float>(theValue);
    uint32_t aWord;
    std::memcpy(&aWord, &aSingle, 4);
    aBits = aWord;
  }
  for (int b = 0; b < theType.mComponentBytes; ++b)
    theOut[theMSBF ? theType.mComponentBytes - 1 - b : b] = static_cast<uint8_t>(aBits >> (8 * b));
}

using TGrid = std::vector<std::vector<std::vector<double>>>; // [row][col][part]

struct SLayout {
  int32_t mHeader, mPrefix, mSuffix;
};

// Cells of lines theRow..theLastRow, columns theColStart..theColEnd (all when -1).
std::vector<uint8_t> encodeCells(const TGrid &theGrid, const STypeInfo &theType, bool theMSBF, int theRow,
                                 int theLastRow = -1, int theColStart = 0, int theColEnd = -1) {
  theLastRow = theLastRow < 0 ? theRow : theLastRow;
  theColEnd = theColEnd < 0 ? static_cast<int>(theGrid[theRow].size()) - 1 : theColEnd;
  std::vector<uint8_t> aOut;
  for (int r = theRow; r <= theLastRow; ++r)
    for (int c = theColStart; c <= theColEnd; ++c)
      for (int p = 0; p < theType.mValues; ++p) {
        aOut.resize(aOut.size() + theType.mComponentBytes);
        encodeComponent(theGrid[r][c][p], theType, theMSBF, aOut.data() + aOut.size() - theType.mComponentBytes);
      }
  return aOut;
}

// The whole file image: header bytes, then prefix + cells + suffix per line.
std::string encodeFile(const TGrid &theGrid, const STypeInfo &theType, bool theMSBF, const SLayout &theLayout,
                       uint8_t theFill = 0) {
  std::string aFile(static_cast<size_t>(theLayout.mHeader), static_cast<char>(theFill));
  for (size_t r = 0; r < theGrid.size(); ++r) {
    aFile.append(static_cast<size_t>(theLayout.mPrefix), static_cast<char>(theFill));
    const std::vector<uint8_t> aCells = encodeCells(theGrid, theType, theMSBF, static_cast<int>(r));
    aFile.append(reinterpret_cast<const char *>(aCells.data()), aCells.size());
    aFile.append(static_cast<size_t>(theLayout.mSuffix), static_cast<char>(theFill));
  }
  return aFile;
}

// Cell (1, 3) is no data; cell (2, 4) has only its first part equal to it.
TGrid makeGrid(const STypeInfo &theType, int theRows, int theCols, double theNull) {
  TGrid aGrid(theRows, std::vector<std::vector<double>>(theCols));
  for (int r = 0; r < theRows; ++r)
    for (int c = 0; c < theCols; ++c)
      for (int p = 0; p < theType.mValues; ++p) {
        const int k = (r * 31 + c * 7 + p * 13) % 100;
        aGrid[r][c].push_back(theType.mKind == EKind::kSigned     ? k - 50
                              : theType.mKind == EKind::kUnsigned ? k
                                                                  : (k - 50) * 0.25);
      }
  aGrid[1][3].assign(theType.mValues, theNull);
  aGrid[2][4][0] = theNull;
  return aGrid;
}

bool isNullBy(double theNull, double theValue) {
  return (std::isnan(theNull) && std::isnan(theValue)) ||
         (theNull - sTolerance <= theValue && theValue <= theNull + sTolerance);
}

// The typed value by the rule, computed directly.
double expectedValue(const std::vector<double> &theCell, double theNull, double theRealScale = 1.0,
                     double theImagScale = 1.0, bool theAmplitude = false) {
  const bool aScale = !(theRealScale == 1.0 && theImagScale == 1.0);
  if (theCell.size() == 1)
    return isNullBy(theNull, theCell[0]) ? theNull : (aScale ? theCell[0] * theRealScale : theCell[0]);
  if (isNullBy(theNull, theCell[0]) && isNullBy(theNull, theCell[1]))
    return theNull;
  const double aRe = theCell[0] * theRealScale, aIm = theCell[1] * theImagScale;
  const double aPower = aRe * aRe + aIm * aIm;
  return theAmplitude ? std::sqrt(aPower) : aPower;
}

bool sameNumber(double theActual, double theExpected) {
  return std::isnan(theExpected) ? std::isnan(theActual) : theActual == theExpected;
}

template <typename T>
void expectSameValues(const std::vector<T> &theActual, const std::vector<T> &theExpected, const std::string &theWhat) {
  ASSERT_EQ(theActual.size(), theExpected.size()) << theWhat;
  for (size_t i = 0; i < theActual.size(); ++i)
    EXPECT_TRUE(sameNumber(theActual[i], theExpected[i])) << theWhat << " cell " << i << ": " << theActual[i];
}

// theBody raises theCode.
void expectCode(int32_t theCode, const std::function<void()> &theBody, const std::string &theWhat = "") {
  std::string aMessage;
  EXPECT_EQ(tlrxRaisedCode(theBody, &aMessage), theCode) << theWhat << " message [" << aMessage << "]";
}

std::vector<uint8_t> bytesOf(const std::string &theText) { return std::vector<uint8_t>(theText.begin(), theText.end()); }

struct SRoundTripCase {
  SLayout mLayout;
  bool mMSBF;
  double mRealScale, mImagScale;
  bool mNaNNull; // which only floating parts can hold
};

class RasterFileTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }
  void TearDown() override {
    if (fdfIsTracing())
      traceText();
  }
  CRasterFileParam param(const std::string &theName, int32_t theCellType, int32_t theLines, int32_t thePixels,
                         const SLayout &theLayout = {0, 0, 0}, double theNull = 0.0) const {
    CRasterFileParam aParam;
    aParam.mFileName = mDir.file(theName);
    aParam.mCellType = theCellType;
    aParam.mNrOfLinesPerImage = theLines;
    aParam.mNrOfPixelsPerLine = thePixels;
    aParam.mHeaderOffset = theLayout.mHeader;
    aParam.mRowPrefix = theLayout.mPrefix;
    aParam.mRowSuffix = theLayout.mSuffix;
    aParam.mNullCellValue = theNull;
    return aParam;
  }
  // theGrid stored as theParam says, written by the test.
  void writeImage(const CRasterFileParam &theParam, const TGrid &theGrid, const STypeInfo &theType,
                  uint8_t theFill = 0) const {
    tlrxWriteFile(theParam.mFileName,
                  encodeFile(theGrid, theType, theParam.mMSBF,
                             {theParam.mHeaderOffset, theParam.mRowPrefix, theParam.mRowSuffix}, theFill));
  }
  // Complex lines of theParam's file (theGrid) read by the rule, also with
  // lines and pixels reversed; each written back gives the same bytes.
  void expectComplexRoundTrip(const CRasterFileParam &theParam, const STypeInfo &theType, const TGrid &theGrid);
  void startTrace() { ASSERT_TRUE(tlrxStartTrace()); }
  std::string traceText() { return tlrxStopTrace(mDir.path()); }
  bool traced(const std::string &theTrace, const std::string &thePart) const {
    return theTrace.find(thePart) != std::string::npos;
  }
};

// All numeric fields of a parameter set, in declaration order.
std::vector<double> fieldsOf(const CRasterFileParam &theParam) {
  return {double(theParam.mNrOfLinesPerImage), double(theParam.mNrOfPixelsPerLine), double(theParam.mCellType),
          double(theParam.mDataUnits),         double(theParam.mHeaderOffset),      double(theParam.mRowPrefix),
          double(theParam.mRowSuffix),         double(theParam.mFooterLen),         theParam.mNullCellValue,
          double(theParam.mMSBF),              double(theParam.mNrOfChannels),      theParam.mRealScaleFactor,
          theParam.mImaginaryScaleFactor};
}

// A complex line read from theFile against the grid: (D, D) and not valid
// when both parts are no data, else the scaled parts.
template <typename T>
void expectComplexLine(CRasterFile &theFile, const TGrid &theGrid, int theRow, int theColStart, int theColEnd,
                       double theNull, double theRealScale, double theImagScale) {
  const size_t aCount = static_cast<size_t>(theColEnd - theColStart + 1);
  std::vector<std::complex<T>> aLine(aCount);
  std::vector<uint8_t> aValid(aCount, 9);
  theFile.getComplexLine(aLine.data(), theRow, theColStart, theColEnd, aValid.data());
  for (size_t i = 0; i < aCount; ++i) {
    const std::vector<double> &aCell = theGrid[theRow][theColStart + i];
    const bool aExpectedValid = !(isNullBy(theNull, aCell[0]) && isNullBy(theNull, aCell[1]));
    const std::vector<T> aExpected = {static_cast<T>(aExpectedValid ? aCell[0] * theRealScale : theNull),
                                      static_cast<T>(aExpectedValid ? aCell[1] * theImagScale : theNull)};
    expectSameValues(std::vector<T>{aLine[i].real(), aLine[i].imag()}, aExpected,
                     "row " + std::to_string(theRow) + " col " + std::to_string(theColStart + i));
    EXPECT_EQ(aValid[i], aExpectedValid ? 1 : 0) << "row " << theRow << " col " << theColStart + i;
  }
}

void RasterFileTest::expectComplexRoundTrip(const CRasterFileParam &theParam, const STypeInfo &theType,
                                            const TGrid &theGrid) {
  const int aRows = static_cast<int>(theGrid.size()), aCols = static_cast<int>(theGrid[0].size());
  const double aNull = theParam.mNullCellValue, aRe = theParam.mRealScaleFactor, aIm = theParam.mImaginaryScaleFactor;
  CRasterFileParam aParams[2] = {theParam, theParam};
  aParams[1].mLinesReversed = aParams[1].mPixelsReversed = true;
  std::vector<std::vector<std::complex<double>>> aRead[2];
  for (int aReversed : {0, 1}) {
    CRasterFile aFile;
    aFile.open_read(aParams[aReversed]);
    aRead[aReversed].assign(aRows, std::vector<std::complex<double>>(aCols));
    for (int r = 0; r < aRows; ++r) {
      if (aReversed == 0) {
        expectComplexLine<double>(aFile, theGrid, r, 0, aCols - 1, aNull, aRe, aIm);
        expectComplexLine<float>(aFile, theGrid, r, 2, 4, aNull, aRe, aIm);
      }
      aFile.getComplexLine(aRead[aReversed][r].data(), r);
    }
  }
  expectSameValues(std::vector<double>{aRead[1][0][0].imag(), aRead[1][0][aCols - 1].real()},
                   {aRead[0][aRows - 1][aCols - 1].imag(), aRead[0][aRows - 1][0].real()}, "reversed corners");
  const std::string aBytes = tlrxReadFile(theParam.mFileName);
  for (int aReversed : {0, 1}) {
    CRasterFileParam aWrite = aParams[aReversed];
    aWrite.mFileName = mDir.file("cx_out.raw");
    CRasterFile aFile;
    aFile.open_write(aWrite);
    for (int r = 0; r < aRows; ++r)
      aFile.putComplexLine(r, aRead[aReversed][r].data());
    aFile.close();
    EXPECT_EQ(bytesOf(tlrxReadFile(aWrite.mFileName)), bytesOf(aBytes)) << "written back, reversed " << aReversed;
  }
}

} // namespace

// Files written by the raster file match an independent encoder; files
// composed byte by byte read back by the rule, as values, windows, raw cells
// and complex lines; complex values read and written back give the same bytes.
TEST_F(RasterFileTest, EveryCellTypeRoundTripsInBothByteOrdersAndLayouts) {
  const int aRows = 5, aCols = 9;
  const bool aMachine = machineIsMSBF();
  const SRoundTripCase aCases[] = {{{0, 0, 0}, false, 1.0, 1.0, false}, {{0, 0, 0}, true, 1.0, 1.0, false},
                                   {{7, 3, 5}, false, 2.0, 0.5, false}, {{7, 3, 5}, true, 1.0, 1.0, false},
                                   {{16, 0, 2}, true, 0.5, 1.0, false}, {{5, 2, 3}, true, 2.0, 0.5, false},
                                   {{0, 0, 0}, true, 1.0, 1.0, true}};
  for (const STypeInfo &aType : sTypes) {
    for (size_t k = 0; k < std::size(aCases); ++k) {
      const SRoundTripCase &aCase = aCases[k];
      if (aCase.mNaNNull && aType.mKind != EKind::kFloat)
        continue;
      const double aNull = aCase.mNaNNull ? NAN : 7.0;
      SCOPED_TRACE(std::string(fdfCellTypeName(aType.mCode)) + " case " + std::to_string(k));
      const TGrid aGrid = makeGrid(aType, aRows, aCols, aNull);
      CRasterFileParam aParam = param("rt_" + std::to_string(aType.mCode) + "_" + std::to_string(k) + ".raw",
                                      aType.mCode, aRows, aCols, aCase.mLayout, aNull);
      aParam.mMSBF = aCase.mMSBF;
      aParam.mRealScaleFactor = aCase.mRealScale;
      aParam.mImaginaryScaleFactor = aCase.mImagScale;
      // Write: a block of two lines, one line through the line buffer, the
      // rest line by line. Sources are in machine order and stay unchanged.
      {
        CRasterFile aFile;
        aFile.open_write(aParam);
        EXPECT_EQ(aFile.isSwapped(), aCase.mMSBF != aMachine && aType.mComponentBytes > 1);
        std::vector<uint8_t> aBlock = encodeCells(aGrid, aType, aMachine, 0, 1);
        const std::vector<uint8_t> aBlockCopy = aBlock;
        EXPECT_EQ(aFile.writeRecords(0, 2, aBlock.data()), 2);
        EXPECT_EQ(aBlock, aBlockCopy) << "the caller's cells were modified";
        const std::vector<uint8_t> aLine2 = encodeCells(aGrid, aType, aMachine, 2);
        std::memcpy(aFile.getLineBuffer(2), aLine2.data(), aLine2.size());
        aFile.putLine(2);
        for (int r = 3; r < aRows; ++r)
          aFile.putLine(r, encodeCells(aGrid, aType, aMachine, r).data());
        aFile.close();
        EXPECT_EQ(aFile.getRasterStatus(), CTLRX_RF_CLOSE);
      }
      // Header, prefixes and suffixes are zero; cells in the stored order.
      EXPECT_EQ(bytesOf(tlrxReadFile(aParam.mFileName)), bytesOf(encodeFile(aGrid, aType, aCase.mMSBF, aCase.mLayout)));
      // Read back our own file, and an independently made one whose header,
      // prefixes and suffixes hold junk; in the caller's order when lines and
      // pixels run reversed.
      CRasterFileParam aForeign = aParam, aReversed = aParam;
      aForeign.mFileName += ".foreign";
      writeImage(aForeign, aGrid, aType, 0xEE);
      aReversed.mLinesReversed = aReversed.mPixelsReversed = true;
      CRasterFile aFile;
      aFile.open_read(aReversed);
      for (int r = 0; r < aRows; ++r) {
        std::vector<double> aLine(3);
        aFile.getLine(aLine.data(), r, 1, 3);
        for (int c = 1; c <= 3; ++c) // caller column c is file column 8 - c of file line 4 - r
          EXPECT_TRUE(sameNumber(aLine[c - 1], expectedValue(aGrid[aRows - 1 - r][aCols - 1 - c], aNull,
                                                             aCase.mRealScale, aCase.mImagScale)))
              << "reversed " << r << "," << c;
      }
      aFile.close();
      for (const CRasterFileParam &aRead : {aParam, aForeign}) {
        aFile.open_read(aRead);
        for (int r = 0; r < aRows; ++r) {
          for (bool aAmplitude : {false, true}) {
            std::vector<double> aExpected, aLine(aCols);
            for (int c = 0; c < aCols; ++c)
              aExpected.push_back(expectedValue(aGrid[r][c], aNull, aCase.mRealScale, aCase.mImagScale, aAmplitude));
            aFile.getLine(aLine.data(), r, 0, -1, aAmplitude);
            expectSameValues(aLine, aExpected, "double row " + std::to_string(r));
            // Column window 2..6 as float.
            std::vector<float> aWindow(5);
            aFile.getLine(aWindow.data(), r, 2, 6, aAmplitude);
            expectSameValues(aWindow, std::vector<float>(aExpected.begin() + 2, aExpected.begin() + 7),
                             "float window row " + std::to_string(r));
          }
        }
        // Raw cells of a block with a column window, in machine order.
        std::vector<uint8_t> aRaw(static_cast<size_t>(3 * 4 * aType.mComponentBytes * aType.mValues), 0x5A);
        EXPECT_EQ(aFile.readRecords(1, 3, 1, 4, aRaw.data()), 3);
        EXPECT_EQ(aRaw, encodeCells(aGrid, aType, aMachine, 1, 3, 1, 4)) << "raw window of " << aRead.mFileName;
        aFile.close();
      }
      if (aType.mValues == 2)
        expectComplexRoundTrip(aParam, aType, aGrid);
    }
  }
}

TEST_F(RasterFileTest, BitRastersPackEightPixelsPerByte) {
  const int aRows = 4, aCols = 10;
  const auto aBit = [](int theRow, int theCol) { return (theRow * 3 + theCol) % 3 == 0 || theCol == 8; };
  // Records of 10 BIT pixels: prefix + 2 + suffix bytes; never swapped: single bytes.
  CRasterFileParam aParam = param("bits.raw", CTLRX_CELL_BIT, aRows, aCols, {2, 1, 3}, -1.0);
  aParam.mMSBF = !machineIsMSBF();
  std::string aExpected(2, '\0');
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
  EXPECT_EQ(tlrxReadFile(aParam.mFileName), aExpected);
  aFile.open_read(aParam);
  for (int r = 0; r < aRows; ++r) {
    std::vector<float> aLine(aCols);
    aFile.getLine(aLine.data(), r);
    std::vector<double> aWindow(3);
    aFile.getLine(aWindow.data(), r, 7, 9);
    for (int c = 0; c < aCols; ++c) {
      EXPECT_EQ(aLine[c], aBit(r, c) ? 1.0f : 0.0f) << r << "," << c;
      if (c >= 7)
        EXPECT_EQ(aWindow[c - 7], aBit(r, c) ? 1.0 : 0.0) << r << "," << c;
    }
  }
  // The raw line is always whole, whatever the requested columns.
  uint8_t aRaw[2] = {0, 0};
  aFile.readRecords(0, 1, 8, 9, aRaw);
  EXPECT_EQ(aRaw[1] & 0x80, 0x80); // pixel 8 is the top bit of the second byte
}

TEST_F(RasterFileTest, ReadCacheRefillsWhenTheColumnsChange) {
  std::vector<double> aLine(9);
  CRasterFile aFile;
  const TGrid aShorts = makeGrid(sShort, 6, 9, 7.0);
  const CRasterFileParam aPrefixed = param("cols.raw", CTLRX_CELL_SHORT, 6, 9, {0, 2, 0}, 7.0);
  writeImage(aPrefixed, aShorts, sShort);
  aFile.open_read(aPrefixed);
  ASSERT_TRUE(aFile.setBuffer(3));
  aFile.getLine(aLine.data(), 1, 2, 4);
  aFile.getLine(aLine.data(), 2, 0, 8); // another window on a cached line
  for (int c = 0; c < 9; ++c)
    EXPECT_EQ(aLine[c], expectedValue(aShorts[2][c], 7.0)) << c;
  aFile.getLine(aLine.data(), 2, 3, 8); // the first column alone moves
  for (int c = 0; c < 6; ++c)
    EXPECT_EQ(aLine[c], expectedValue(aShorts[2][c + 3], 7.0)) << c;
}

TEST_F(RasterFileTest, IntegerExtremesAndNoDataTolerance) {
  const float aFloat01 = 0.1f;
  const struct {
    STypeInfo mType;
    std::vector<double> mCells;
    double mNull;
  } aCases[] = {
      {{CTLRX_CELL_UNSIGNED_INT, 4, 1, EKind::kUnsigned}, {4294967295.0, 0, 7, 8}, 7.5},
      {{CTLRX_CELL_INT, 4, 1, EKind::kSigned}, {-2147483648.0, 2147483647.0, 7, -7}, 7.0},
      {{CTLRX_CELL_UNSIGNED_SHORT, 2, 1, EKind::kUnsigned}, {65535, 0, 1, 2}, 65535},
      {{CTLRX_CELL_SHORT, 2, 1, EKind::kSigned}, {-32768, 32767, 0, 1}, 0.0},
      {{CTLRX_CELL_FLOAT, 4, 1, EKind::kFloat}, {1e-38, 2e-38, -1e-38, 5.0}, 0.0},
      {{CTLRX_CELL_FLOAT, 4, 1, EKind::kFloat}, {aFloat01, 0.1, 5.0, 0.0}, 0.1},
      {{CTLRX_CELL_DOUBLE, 8, 1, EKind::kFloat}, {1e-38, 1.2e-38, -1.1e-38, 3.0}, 0.0},
      {{CTLRX_CELL_DOUBLE, 8, 1, EKind::kFloat}, {NAN, 1.0, INFINITY, NAN}, NAN},
      {{CTLRX_CELL_FLOAT, 4, 1, EKind::kFloat}, {INFINITY, -INFINITY, 1e30, 2.0}, INFINITY},
  };
  for (size_t k = 0; k < std::size(aCases); ++k) {
    const auto &aCase = aCases[k];
    SCOPED_TRACE("case " + std::to_string(k));
    const bool aSingle = aCase.mType.mKind == EKind::kFloat && aCase.mType.mComponentBytes == 4;
    TGrid aGrid(1);
    for (double aCell : aCase.mCells)
      aGrid[0].push_back({aSingle ? static_cast<double>(static_cast<float>(aCell)) : aCell});
    CRasterFileParam aParam = param("x" + std::to_string(k), aCase.mType.mCode, 1, 4, {0, 0, 0}, aCase.mNull);
    aParam.mMSBF = true;
    writeImage(aParam, aGrid, aCase.mType);
    CRasterFile aFile;
    aFile.open_read(aParam);
    std::vector<double> aLine(4), aExpected;
    std::vector<float> aFloats(4), aExpectedFloats;
    aFile.getLine(aLine.data(), 0);
    aFile.getLine(aFloats.data(), 0);
    for (const std::vector<double> &aCell : aGrid[0]) {
      aExpected.push_back(expectedValue(aCell, aCase.mNull));
      aExpectedFloats.push_back(static_cast<float>(aExpected.back()));
    }
    expectSameValues(aLine, aExpected, "double");
    expectSameValues(aFloats, aExpectedFloats, "float");
  }
}

TEST_F(RasterFileTest, ScaleFactorsAndTheValidMask) {
  // Scale factors of one are no scaling, a NaN factor scales everything,
  // and no data stays no data.
  CRasterFileParam aParam = param("s.raw", CTLRX_CELL_SHORT, 1, 3, {0, 0, 0}, 7);
  const int16_t aCells[3] = {3, -4, 7};
  tlrxWriteFile(aParam.mFileName, std::string(reinterpret_cast<const char *>(aCells), sizeof(aCells)));
  aParam.mMSBF = machineIsMSBF();
  std::vector<double> aLine(3);
  aParam.mRealScaleFactor = NAN;
  CRasterFile aFile;
  aFile.open_read(aParam);
  aFile.getLine(aLine.data(), 0);
  EXPECT_TRUE(std::isnan(aLine[0]) && std::isnan(aLine[1]));
  EXPECT_EQ(aLine[2], 7.0);
  aFile.close();
  aParam.mRealScaleFactor = 1.0;
  aParam.mImaginaryScaleFactor = 3.0; // any factor other than 1 turns scaling on
  aFile.open_read(aParam);
  aFile.getLine(aLine.data(), 0);
  EXPECT_EQ(aLine, (std::vector<double>{3, -4, 7}));
  aFile.close();
  // The valid mask marks no-data cells, NaN included when the null is NaN.
  CRasterFileParam aMasked = param("m.raw", CTLRX_CELL_FLOAT, 1, 5);
  const float aFloats[5] = {NAN, 5.0f, 0.0f, 1e-39f, -2.0f};
  tlrxWriteFile(aMasked.mFileName, std::string(reinterpret_cast<const char *>(aFloats), sizeof(aFloats)));
  aMasked.mMSBF = machineIsMSBF();
  std::vector<double> aValues(5);
  std::vector<int32_t> aMask(5, 9);
  for (const auto &aCase : std::vector<std::pair<double, std::vector<int32_t>>>{
           {NAN, {0, 1, 1, 1, 1}}, {5.0, {1, 0, 1, 1, 1}}, {0.0, {1, 1, 0, 0, 1}}}) {
    aMasked.mNullCellValue = aCase.first;
    aFile.open_read(aMasked);
    aFile.getValidMask(aValues.data(), aMask.data(), 0);
    EXPECT_EQ(aMask, aCase.second) << "null " << aCase.first;
    aFile.close();
  }
}

TEST_F(RasterFileTest, ComplexWritesRoundSaturateAndStoreNoDataAsTheNull) {
  CRasterFileParam aParam = param("cw.raw", CTLRX_CELL_SHORT_COMPLEX, 1, 5, {0, 0, 0}, -9999.0);
  aParam.mMSBF = true;
  aParam.mImaginaryScaleFactor = 0.5;
  const std::vector<std::complex<float>> aValues = {
      {1.5f, -1.25f}, {1e6f, -1e6f}, {NAN, 3.0f}, {-9999.0f, -9999.0f}, {-9999.0f, 2.0f}};
  CRasterFile aFile;
  aFile.open_write(aParam);
  aFile.putComplexLine(0, aValues.data());
  expectCode(CTLRX_ERR_FILE_PARSE, [&] { aFile.putComplexLine(1, aValues.data()); }, "line outside");
  aFile.close();
  // Real parts rounded to the nearest (even on ties), imaginary parts
  // divided by 0.5 first; beyond the range saturated; NaN as 0; a no-data
  // value stored unscaled as the null in both parts.
  const TGrid aExpected = {{{2, -2}, {32767, -32768}, {0, 6}, {-9999, -9999}, {-9999, 4}}};
  EXPECT_EQ(bytesOf(tlrxReadFile(aParam.mFileName)),
            bytesOf(encodeFile(aExpected, {CTLRX_CELL_SHORT_COMPLEX, 2, 2, EKind::kSigned}, true, {0, 0, 0})));
}

TEST_F(RasterFileTest, ReadCacheServesItsLinesInBothDirections) {
  // Lines of 256 KiB, as large as the stream buffer: the stream reads them
  // straight into the cache, so what the cache holds is all the object has.
  const int aRows = 10, aCols = 65536;
  const TGrid aGrid = makeGrid(sFloat, aRows, aCols, -1.0);
  CRasterFileParam aParam = param("cache.raw", CTLRX_CELL_FLOAT, aRows, aCols, {0, 0, 0}, -1.0);
  const auto aExpectedLine = [&](int theFileRow) {
    std::vector<float> aLine;
    for (int c = 0; c < aCols; ++c)
      aLine.push_back(static_cast<float>(expectedValue(aGrid[theFileRow][c], -1.0)));
    return aLine;
  };
  std::vector<float> aLine(aCols);
  for (bool aReversed : {false, true}) {
    writeImage(aParam, aGrid, sFloat);
    aParam.mLinesReversed = aReversed;
    CRasterFile aFile;
    aFile.open_read(aParam);
    ASSERT_TRUE(aFile.setBuffer(4));
    EXPECT_EQ(aFile.getBufferSize(), 4);
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
}

TEST_F(RasterFileTest, WriteCacheQueuesLinesUntilFullOrClosed) {
  const int aRows = 7, aCols = 5;
  const TGrid aGrid = makeGrid(sFloatComplex, aRows, aCols, 7.0);
  CRasterFileParam aParam = param("wcache.raw", CTLRX_CELL_FLOAT_COMPLEX, aRows, aCols, {0, 0, 4});
  aParam.mMSBF = true;
  CRasterFile aFile;
  aFile.open_write(aParam);
  ASSERT_TRUE(aFile.setBuffer(3));
  const int aOrder[aRows] = {6, 0, 2, 1, 3, 5, 4};
  for (int i = 0; i < aRows; ++i) {
    const std::vector<uint8_t> aCells = encodeCells(aGrid, sFloatComplex, machineIsMSBF(), aOrder[i]);
    if (i < 2) {
      aFile.putLine(aOrder[i], aCells.data());
      continue;
    }
    if (i == 2) {
      struct stat aStat;
      ASSERT_EQ(stat(aParam.mFileName.c_str(), &aStat), 0);
      EXPECT_EQ(aStat.st_size, 0) << "queued lines are not written yet";
    }
    std::memcpy(aFile.getLineBuffer(aOrder[i]), aCells.data(), aCells.size());
    aFile.putLine(aOrder[i]);
  }
  aFile.close(); // writes the last queued lines
  EXPECT_EQ(bytesOf(tlrxReadFile(aParam.mFileName)), bytesOf(encodeFile(aGrid, sFloatComplex, true, {0, 0, 4})));
}

TEST_F(RasterFileTest, UpdateWritesOnlyTheCellsAndKeepsPrefixesAndOtherColumns) {
  TGrid aGrid = makeGrid(sShort, 4, 6, 7.0);
  CRasterFileParam aParam = param("upd.raw", CTLRX_CELL_SHORT, 4, 6, {5, 3, 1}, 7.0);
  aParam.mMSBF = true;
  writeImage(aParam, aGrid, sShort, 0xEE);
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
  for (int aRow : {2, 3}) {
    aFile.getLine(aLine.data(), aRow);
    for (int c = 0; c < 6; ++c)
      EXPECT_EQ(aLine[c], expectedValue(aGrid[aRow][c], 7.0)) << aRow << "," << c;
    if (aRow == 3)
      break;
    std::vector<int16_t> aWhole = {1, 2, 3, 4, 5, 6};
    const std::vector<int16_t> aWholeCopy = aWhole;
    aFile.writeRecords(2, 1, aWhole.data());
    EXPECT_EQ(aWhole, aWholeCopy);
    for (int c = 0; c < 6; ++c)
      aGrid[2][c] = {static_cast<double>(c + 1)};
  }
  aFile.close();
  EXPECT_EQ(bytesOf(tlrxReadFile(aParam.mFileName)), bytesOf(encodeFile(aGrid, sShort, true, {5, 3, 1}, 0xEE)));
}

// Update mode creates a missing file; column windows keep each other's
// cells; rows beyond the image are clamped; lines never written are padded,
// with a warning; the destructor closes; a closed object reopens, and
// closes only once.
TEST_F(RasterFileTest, SmallWritesGiveTheExactBytes) {
  CRasterFile aFile;
  const CRasterFileParam aNew = param("new_update.raw", CTLRX_CELL_UNSIGNED_BYTE, 2, 3);
  aFile.open_read_write(aNew);
  const uint8_t aCells[4] = {9, 8, 7, 6}, aA[2] = {1, 2}, aB[2] = {3, 4}, aC[4] = {5, 6, 7, 8};
  aFile.writeRecords(1, 1, aCells);
  aFile.close();
  EXPECT_EQ(tlrxReadFile(aNew.mFileName), std::string("\0\0\0\x09\x08\x07", 6));
  const CRasterFileParam aWindows = param("win.raw", CTLRX_CELL_UNSIGNED_BYTE, 4, 4, {0, 1, 1});
  aFile.open_write(aWindows);
  aFile.writeRecords(2, 1, aA, 0, 1);
  aFile.writeRecords(0, 1, aC);
  aFile.writeRecords(2, 1, aB, 2, 3);
  const int32_t aWarnings = fdfGetWarningCount();
  startTrace();
  aFile.close(); // lines 1 and 3 never written: zeros, line 3 by padding
  EXPECT_TRUE(traced(traceText(), "\nWARNING NULL line writed : 1 in file : " + aWindows.mFileName));
  EXPECT_EQ(fdfGetWarningCount(), aWarnings + 1);
  const std::string aLog = tlrxReadFile(mDir.file("Process.log"));
  EXPECT_TRUE(traced(aLog, "[ERROR ID : 130561]") && traced(aLog, aWindows.mFileName)) << aLog;
  EXPECT_EQ(tlrxReadFile(aWindows.mFileName), std::string("\0\x05\x06\x07\x08\0"
                                                          "\0\0\0\0\0\0"
                                                          "\0\x01\x02\x03\x04\0"
                                                          "\0\0\0\0\0\0",
                                                          24));
  const CRasterFileParam aClamped = param("wclamp.raw", CTLRX_CELL_BYTE, 3, 2);
  aFile.open_write(aClamped);
  EXPECT_EQ(aFile.writeRecords(12, 1, aCells), 1);
  aFile.close();
  EXPECT_EQ(tlrxReadFile(aClamped.mFileName), std::string("\0\0\0\0\x09\x08", 6));
  aFile.open_read(aWindows);
  std::vector<float> aLine(4);
  aFile.getLine(aLine.data(), 2);
  EXPECT_EQ(aLine, (std::vector<float>{1, 2, 3, 4}));
  aFile.close();
  expectCode(CTLRX_ERR_FILE_PARSE, [&] { aFile.close(); }, "second close");
  const CRasterFileParam aDestroyed = param("dtor.raw", CTLRX_CELL_INT, 4, 2);
  const int32_t aInts[2] = {-1, 1};
  {
    CRasterFile aScoped;
    aScoped.open_write(aDestroyed);
    aScoped.setBuffer(2);
    aScoped.putLine(0, aInts);
  }
  EXPECT_EQ(tlrxReadFile(aDestroyed.mFileName),
            std::string(reinterpret_cast<const char *>(aInts), 8) + std::string(24, '\0'));
}

TEST_F(RasterFileTest, OutOfRangeRecordsAreClampedNeverOverrun) {
  const CRasterFileParam aParam = param("clamp.raw", CTLRX_CELL_UNSIGNED_SHORT, 10, 1000);
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
  for (const char *aPart : {"line -3", "column 2000", "line 12"})
    EXPECT_TRUE(traced(aTrace, std::string("Requested ") + aPart + " is outside the image!\n")) << aPart;
}

// Lines beyond 4 GB written with holes before them (no padding needed),
// found where an independent reader expects them, read and updated in place.
TEST_F(RasterFileTest, SparseFileBeyondFourGigabytes) {
  const int32_t aRows = 45000, aCols = 25000; // FLOAT: 100000-byte records, 4.5e9 bytes in all
  const CRasterFileParam aParam = param("big.raw", CTLRX_CELL_FLOAT, aRows, aCols, {13, 8, 0});
  const int64_t aRecord = 4LL * aCols + 8, aSize = 13 + aRecord * aRows;
  ASSERT_GT(aSize, 4LL * 1024 * 1024 * 1024);
  std::vector<float> aLast(aCols), aLine(aCols, -1.0f);
  for (int c = 0; c < aCols; ++c)
    aLast[c] = static_cast<float>(c) * 0.5f;
  const int32_t aWarnings = fdfGetWarningCount();
  CRasterFile aFile;
  aFile.open_write(aParam);
  aFile.writeRecords(30000, 1, aLast.data());
  aFile.writeRecords(aRows - 1, 1, aLast.data());
  aFile.close();
  EXPECT_EQ(fdfGetWarningCount(), aWarnings);
  struct stat aStat;
  ASSERT_EQ(stat(aParam.mFileName.c_str(), &aStat), 0);
  EXPECT_EQ(aStat.st_size, static_cast<off_t>(aSize));
  const int aFd = open(aParam.mFileName.c_str(), O_RDONLY);
  ASSERT_EQ(pread(aFd, aLine.data(), 4LL * aCols, aSize - 4LL * aCols), 4LL * aCols);
  close(aFd);
  EXPECT_EQ(aLine, aLast);
  aFile.open_read_write(aParam);
  const float aPatch[2] = {-1.0f, -2.0f};
  aFile.writeRecords(aRows - 2, 1, aPatch, 100, 101);
  for (int32_t aRow : {aRows - 1, 30000}) {
    aFile.getLine(aLine.data(), aRow);
    EXPECT_EQ(aLine, aLast) << aRow;
  }
  aFile.getLine(aLine.data(), 0);
  EXPECT_EQ(aLine, std::vector<float>(aCols, 0.0f));
  aFile.getLine(aLine.data(), aRows - 1, 20000, 24999);
  EXPECT_TRUE(std::equal(aLine.begin(), aLine.begin() + 5000, aLast.begin() + 20000));
  aFile.getLine(aLine.data(), aRows - 2, 99, 102);
  EXPECT_EQ(std::vector<float>(aLine.begin(), aLine.begin() + 4), (std::vector<float>{0, -1, -2, 0}));
  aFile.close();
  unlink(aParam.mFileName.c_str());
}

TEST_F(RasterFileTest, ParametersComeFromTheHeaderWithDefaultsAndRoundTrip) {
  CDescription aHeader;
  fdfDeclareStandardHeader(aHeader);
  aHeader.getField("RasterInfo.NrOfLinesPerImage").setInteger(12);
  aHeader.getField("RasterInfo.NrOfPixelsPerLine").setInteger(34);
  aHeader.getField("RasterInfo.CellType").setString("SHORT_COMPLEX");
  CRasterFileParam aParam;
  aParam.setFromDescription("data.raw", aHeader);
  EXPECT_EQ(aParam.mFileName, "data.raw");
  EXPECT_EQ(fieldsOf(aParam), (std::vector<double>{12, 34, CTLRX_CELL_SHORT_COMPLEX, CTLRX_UNITS_UNKNOWN, 0, 0, 0,
                                                    0, 0.0, double(machineIsMSBF()), 1, 1.0, 1.0}));
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
  // The whole layout round trips through a header file.
  aParam = param("hdr.raw", CTLRX_CELL_UNSIGNED_SHORT_COMPLEX, 3, 4, {10, 2, 6}, -9999.5);
  aParam.mDataUnits = CTLRX_UNITS_SLC;
  aParam.mFooterLen = 3;
  aParam.mMSBF = !machineIsMSBF();
  aParam.mNrOfChannels = 2;
  aParam.mRealScaleFactor = 0.25;
  aParam.mImaginaryScaleFactor = 4.0;
  aHeader.clear();
  fdfDeclareStandardHeader(aHeader);
  aParam.storeInDescription(aHeader);
  ASSERT_TRUE(fdfWriteStandardHeader(aParam.mFileName.c_str(), aHeader, true));
  CRasterFileParam aRead;
  aRead.readFromHeader(aParam.mFileName.c_str());
  EXPECT_EQ(aRead.mFileName, aParam.mFileName);
  EXPECT_EQ(fieldsOf(aRead), fieldsOf(aParam));
  // Write by name (the header exists), then read by name and through the
  // loaded description.
  const std::vector<uint16_t> aCells = {1, 2, 3, 4, 5, 6, 7, 8};
  CRasterFile aFile;
  aFile.open_write(aParam.mFileName.c_str());
  EXPECT_TRUE(aFile.isSwapped());
  for (int r = 0; r < 3; ++r)
    aFile.writeRecords(r, 1, aCells.data());
  aFile.close();
  EXPECT_EQ(tlrxReadFile(aParam.mFileName).size(), 10u + 3u * (2u + 16u + 6u));
  for (int aForm = 0; aForm < 2; ++aForm) {
    if (aForm == 0)
      aFile.open_read(aParam.mFileName.c_str());
    else
      aFile.open_read(aParam.mFileName.c_str(), aHeader);
    EXPECT_EQ(aFile.getDataUnits(), CTLRX_UNITS_SLC);
    EXPECT_EQ(aFile.getDataNbr(), 2);
    EXPECT_EQ(aFile.getDummyVal(), -9999.5);
    std::vector<double> aLine(4);
    aFile.getLine(aLine.data(), 2, 0, -1, true);
    for (int c = 0; c < 4; ++c)
      EXPECT_DOUBLE_EQ(aLine[c], std::hypot(aCells[2 * c] * 0.25, aCells[2 * c + 1] * 4.0)) << aForm << " " << c;
    aFile.close();
  }
}

TEST_F(RasterFileTest, SizesOutsideTheLimitAreRefused) {
  for (const auto &[aLines, aPixels] : std::vector<std::pair<int32_t, int32_t>>{
           {0, 5}, {5, 0}, {-1, 5}, {900001, 1}, {1, 900001}}) {
    for (int32_t aMode : {CTLRX_RF_OPEN_READ, CTLRX_RF_OPEN_WRITE, CTLRX_RF_OPEN_READ_WRITE}) {
      const CRasterFileParam aParam = param("size.raw", CTLRX_CELL_FLOAT, aLines, aPixels);
      tlrxWriteFile(aParam.mFileName, "keep");
      CRasterFile aFile;
      expectCode(CTLRX_ERR_FILE_PARSE, [&] {
        if (aMode == CTLRX_RF_OPEN_READ)
          aFile.open_read(aParam);
        else if (aMode == CTLRX_RF_OPEN_WRITE)
          aFile.open_write(aParam);
        else
          aFile.open_read_write(aParam);
      }, std::to_string(aLines) + "x" + std::to_string(aPixels));
      EXPECT_EQ(aFile.getRasterStatus(), CTLRX_RF_CLOSE);
      EXPECT_EQ(tlrxReadFile(aParam.mFileName), "keep") << "a refused layout leaves the file alone";
    }
  }
  // The limit itself is accepted.
  const CRasterFileParam aParam = param("limit.raw", CTLRX_CELL_BYTE, CTLRX_RASTER_FILE_MAX_ROWS, 1);
  CRasterFile aFile;
  aFile.open_write(aParam);
  EXPECT_EQ(aFile.getNrOfLinesPerImage(), 900000);
  aFile.close();
  EXPECT_EQ(tlrxReadFile(aParam.mFileName).size(), 900000u);
}

TEST_F(RasterFileTest, UnknownCellTypesAndNegativeLayoutsAreRefused) {
  CRasterFile aFile;
  for (int32_t aType : {-1, 15, 1000})
    expectCode(CTLRX_ERR_FILE_PARSE, [&] { aFile.open_write(param("t.raw", aType, 2, 2)); }, std::to_string(aType));
  const CRasterFileParam aParam = param("neg.raw", CTLRX_CELL_FLOAT, 2, 2);
  tlrxWriteFile(aParam.mFileName, std::string(64, '\0'));
  for (int32_t CRasterFileParam::*aField : {&CRasterFileParam::mHeaderOffset, &CRasterFileParam::mRowPrefix,
                                            &CRasterFileParam::mRowSuffix, &CRasterFileParam::mFooterLen}) {
    CRasterFileParam aBad = aParam;
    aBad.*aField = -4;
    expectCode(CTLRX_ERR_FILE_PARSE, [&] { aFile.open_read(aBad); }, "negative field");
  }
  // Records longer than 2^31 - 1 bytes cannot be addressed by the layout.
  expectCode(CTLRX_ERR_FILE_PARSE, [&] { aFile.open_write(param("neg.raw", CTLRX_CELL_FLOAT, 2, 2, {0, 2147483000, 1000})); },
             "record too long");
  // A header naming a cell type outside the vocabulary.
  CDescription aHeader;
  fdfDeclareStandardHeader(aHeader);
  aHeader.getField("RasterInfo.NrOfLinesPerImage").setInteger(2);
  aHeader.getField("RasterInfo.NrOfPixelsPerLine").setInteger(2);
  aHeader.getField("RasterInfo.CellType").setString("float");
  expectCode(CTLRX_ERR_FILE_PARSE, [&] { aFile.open_read(aParam.mFileName.c_str(), aHeader); });
}

TEST_F(RasterFileTest, FilesShorterThanTheirHeaderAreNeverReadAsZeros) {
  const CRasterFileParam aParam = param("short.raw", CTLRX_CELL_FLOAT, 4, 4);
  const std::string aFull(64, '\x11');
  struct SCase {
    int32_t mHeader, mPrefix;
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
  aFile.getLine(aBlock.data(), 1); // lines still in the file read normally
  expectCode(CTLRX_ERR_FILE_READ, [&] { aFile.getLine(aBlock.data(), 3); });
  // Update mode on a file shorter than the image: reading a missing line
  // fails; no cache in update mode.
  aFile.close();
  aFile.open_read_write(aParam);
  EXPECT_FALSE(aFile.setBuffer(4));
  expectCode(CTLRX_ERR_FILE_READ, [&] { aFile.getLine(aBlock.data(), 3); });
}

TEST_F(RasterFileTest, MissingFilesAndUnwritableFolders) {
  CRasterFile aFile;
  expectCode(CTLRX_ERR_FILE_OPEN, [&] { aFile.open_read(param("absent.raw", CTLRX_CELL_FLOAT, 2, 2)); });
  expectCode(CTLRX_ERR_FILE_OPEN, [&] { aFile.open_read(mDir.file("absent.raw").c_str()); }, "no header");
  expectCode(CTLRX_ERR_FILE_OPEN, [&] { aFile.open_read(param("", CTLRX_CELL_FLOAT, 1, 1)); }, "a folder");
  // A folder that refuses new files (permissions for ordinary users; /proc
  // refuses even the superuser).
  const std::string aLocked = mDir.file("locked");
  ASSERT_EQ(mkdir(aLocked.c_str(), 0555), 0);
  for (const std::string &aName : {mDir.file("no/such/folder/out.raw"),
                                   geteuid() == 0 ? std::string("/proc/tlrx_raster_test.raw") : aLocked + "/out.raw"})
    for (bool aUpdate : {false, true}) {
      CRasterFileParam aParam = param("", CTLRX_CELL_FLOAT, 2, 2);
      aParam.mFileName = aName;
      expectCode(CTLRX_ERR_FILE_WRITE, [&] { aUpdate ? aFile.open_read_write(aParam) : aFile.open_write(aParam); },
                 aName);
      EXPECT_EQ(aFile.getRasterStatus(), CTLRX_RF_CLOSE);
    }
  chmod(aLocked.c_str(), 0755);
  // Writing needs a name.
  CRasterFileParam aNameless = param("", CTLRX_CELL_FLOAT, 2, 2);
  aNameless.mFileName.clear();
  expectCode(CTLRX_ERR_FILE_PARSE, [&] { aFile.open_write(aNameless); });
  expectCode(CTLRX_ERR_FILE_PARSE, [&] { aFile.open_read_write(aNameless); });
}

TEST_F(RasterFileTest, ModesRefuseWhatTheyDoNotAllow) {
  const CRasterFileParam aParam = param("modes.raw", CTLRX_CELL_FLOAT, 2, 3);
  tlrxWriteFile(aParam.mFileName, std::string(24, '\x01'));
  float aCells[6] = {0};
  const std::complex<float> aComplex[3] = {};
  CRasterFile aClosed;
  expectCode(CTLRX_ERR_FILE_READ, [&] { aClosed.readRecords(0, 1, 0, 2, aCells); }, "read when closed");
  expectCode(CTLRX_ERR_FILE_WRITE, [&] { aClosed.writeRecords(0, 1, aCells); }, "write when closed");
  expectCode(CTLRX_ERR_FILE_READ, [&] { aClosed.getLineBuffer(0); }, "line buffer when closed");
  expectCode(CTLRX_ERR_FILE_READ, [&] { aClosed.getLine(aCells, 0); }, "getLine when closed");
  expectCode(CTLRX_ERR_FILE_WRITE, [&] { aClosed.putLine(0); }, "putLine when closed");
  EXPECT_FALSE(aClosed.seekLinePosition(0));
  EXPECT_FALSE(aClosed.setBuffer(4));
  CRasterFile aReader;
  aReader.open_read(aParam);
  expectCode(CTLRX_ERR_FILE_WRITE, [&] { aReader.putLine(0, aCells); }, "putLine in read mode");
  expectCode(CTLRX_ERR_FILE_READ, [&] { aReader.readRecords(0, 0, 0, 2, aCells); }, "no lines");
  expectCode(CTLRX_ERR_FILE_READ, [&] { aReader.readRecords(0, -2, 0, 2, aCells); }, "negative lines");
  expectCode(CTLRX_ERR_FILE_READ, [&] { aReader.readRecords(0, 1, 2, 1, aCells); }, "columns crossed");
  for (const auto &aColumns : std::vector<std::pair<int, int>>{{2, 1}, {-1, 2}, {0, 3}, {3, 3}})
    expectCode(CTLRX_ERR_FILE_PARSE, [&] { aReader.getLine(aCells, 0, aColumns.first, aColumns.second); },
               "getLine columns " + std::to_string(aColumns.first) + ".." + std::to_string(aColumns.second));
  for (int aRow : {-1, 2})
    expectCode(CTLRX_ERR_FILE_PARSE, [&] { aReader.getLine(aCells, aRow); }, "getLine row " + std::to_string(aRow));
  const CRasterFileParam aOut = param("modes_out.raw", CTLRX_CELL_FLOAT, 2, 3);
  CRasterFile aWriter;
  aWriter.open_write(aOut);
  startTrace();
  expectCode(CTLRX_ERR_FILE_READ, [&] { aWriter.readRecords(0, 1, 0, 2, aCells); }, "read in write mode");
  expectCode(CTLRX_ERR_FILE_WRITE, [&] { aReader.writeRecords(0, 1, aCells); }, "write in read mode");
  const std::string aTrace = traceText();
  EXPECT_TRUE(traced(aTrace, "Error: attempting to read from the raster file " + aOut.mFileName +
                                 " while it was open in write mode\n"));
  EXPECT_TRUE(traced(aTrace, "Error: attempting to write to the raster file " + aParam.mFileName +
                                 " while it was open in read mode\n"));
  expectCode(CTLRX_ERR_FILE_READ, [&] { aWriter.getLine(aCells, 0); }, "getLine in write mode");
  expectCode(CTLRX_ERR_FILE_WRITE, [&] { aWriter.writeRecords(0, 0, aCells); }, "no lines");
  expectCode(CTLRX_ERR_FILE_WRITE, [&] { aWriter.writeRecords(0, 1, aCells, 2, 1); }, "columns crossed");
  expectCode(CTLRX_ERR_FILE_PARSE, [&] { aWriter.putComplexLine(0, aComplex); }, "complex line of real cells");
  aWriter.writeRecords(0, 2, aCells);
  aWriter.close();
  // Opening an open object is refused for every mode; the open file stays
  // open and the other is never touched.
  const CRasterFileParam aOther = param("other.raw", CTLRX_CELL_FLOAT, 2, 3);
  startTrace();
  expectCode(CTLRX_ERR_FILE_PARSE, [&] { aReader.open_write(aOther); }, "write");
  expectCode(CTLRX_ERR_FILE_PARSE, [&] { aReader.open_read_write(aOther); }, "update");
  expectCode(CTLRX_ERR_FILE_PARSE, [&] { aReader.open_read(aParam); }, "read");
  expectCode(CTLRX_ERR_FILE_PARSE, [&] { aReader.open_write(aOther.mFileName.c_str()); }, "write by name");
  EXPECT_TRUE(traced(traceText(), "Error: attempting to open the raster file " + aOther.mFileName +
                                      " in input mode while it was not closed\n"));
  EXPECT_FALSE(tlrxFileExists(aOther.mFileName));
  EXPECT_EQ(aReader.getRasterStatus(), CTLRX_RF_OPEN_READ);
  aReader.getLine(aCells, 1);
  EXPECT_EQ(aCells[0], aCells[1]);
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
    EXPECT_TRUE(traced(aTrace, aPart)) << aPart;
}
