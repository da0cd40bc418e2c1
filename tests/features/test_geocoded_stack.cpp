// Geocoded image stack and map grids: the union grid of overlapping inputs,
// values landing at the right cells, each kernel on surfaces it reproduces,
// the fallbacks at holes and edges, and the temporary files of a run.
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_geocoded_stack.h"
#include "tlrx_map_grid.h"
#include "tlrx_platform.h"
#include "tlrx_temporal_grid.h"
#include "tlrx_command_test_support.h"
#include "tlrx_temporal_test_support.h"

#include <gtest/gtest.h>

#include <cmath>
#include <functional>

namespace {

constexpr double sNull = -99;

class GeocodedStackTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }

  // A geocoded raster of theLines x thePixels cells, value f(line, pixel).
  void raster(const std::string &theName, int theLines, int thePixels, double theNorth0, double theEast0,
              double theStep, const std::function<double(int, int)> &theValue, double theNorthStep = 0) {
    STLRXTestRaster aRaster;
    aRaster.mLines = theLines;
    aRaster.mPixels = thePixels;
    aRaster.mCellType = "DOUBLE";
    aRaster.mHasNull = true;
    aRaster.mNull = sNull;
    aRaster.mAcquisitionTime = tlrxAcquisitionText(0);
    for (int l = 0; l < theLines; ++l)
      for (int p = 0; p < thePixels; ++p)
        aRaster.mValues.push_back(theValue(l, p));
    tlrxWriteTestRaster(mDir.file(theName), aRaster);
    tlrxGeocodeTestRaster(mDir.file(theName), theNorth0, theEast0, theNorthStep != 0 ? theNorthStep : -theStep,
                          theStep);
  }

  void list(const std::vector<std::string> &theNames) {
    std::string aText;
    for (const std::string &aName : theNames)
      aText += mDir.file(aName) + "\n";
    tlrxWriteFile(mDir.file("list.txt"), aText + "#\n");
  }

  // Stack of theNames on the grid header theGrid with kernel theKernel.
  void open(CGeocodedImageStack &theStack, const std::vector<std::string> &theNames, const std::string &theGrid,
            const char *theKernel, int theClip = 0) {
    list(theNames);
    ASSERT_TRUE(theStack.initialise(mDir.file("list.txt").c_str(), mDir.file(theGrid).c_str(), theKernel, 1, theClip));
  }

  std::vector<double> line(CGeocodedImageStack &theStack, int theInput, int theLine) {
    std::vector<double> aValues(theStack.getGrid().mPixels);
    theStack.getLine(theInput, theLine, aValues.data());
    return aValues;
  }
};

// Input cells of 20 m; grids of 10 m over the same extent: output cell
// (r, c) has its centre at input position ((r - 0.5) / 2, (c - 0.5) / 2).
double inputPosition(int theIndex) { return (theIndex - 0.5) / 2.0; }

} // namespace

TEST_F(GeocodedStackTest, UnionGridOfTwoOverlappingInputsAndTheirCells) {
  // A: 4 x 6 cells of 10 m from (E 500, N 9000). B: 3 x 3 cells of 25 m from
  // (E 540, N 8985): union E 500..615, N 9000..8910 at 10 m -> 9 x 11.
  raster("A", 4, 6, 9000, 500, 10, [](int l, int p) { return 100 * l + p; });
  raster("B", 3, 3, 8985, 540, 25, [](int l, int p) { return 1000 + 10 * l + p; });
  const STemporalGridInfo aInfo = fdfBuildTemporalGrid({mDir.file("A"), mDir.file("B")}, mDir.file("grid"));
  EXPECT_TRUE(aInfo.mGeocoded);
  EXPECT_EQ(aInfo.mLargestPixels, 6);
  CDescription aHeader;
  fdfReadStandardHeader(mDir.file("grid").c_str(), aHeader);
  SMapGrid aGrid;
  std::string aProblem;
  ASSERT_TRUE(fdfReadMapGrid(aHeader, aGrid, aProblem)) << aProblem;
  EXPECT_EQ(aGrid.mLines, 9);
  EXPECT_EQ(aGrid.mPixels, 11);
  EXPECT_EQ(aGrid.mEast0, 500);
  EXPECT_EQ(aGrid.mNorth0, 9000);
  EXPECT_EQ(aGrid.mEastStep, 10);
  EXPECT_EQ(aGrid.mNorthStep, -10);
  EXPECT_STREQ(aHeader.getField("RasterInfo.CellType").getString(), "FLOAT");

  CGeocodedImageStack aStack;
  open(aStack, {"A", "B"}, "grid", "nearest_neighbour");
  EXPECT_EQ(aStack.getNullValues(), std::vector<double>({sNull, sNull}));
  for (int r = 0; r < 9; ++r)
    for (int c = 0; c < 11; ++c) {
      // A: the same cell; B: the 25 m cell holding the centre of (r, c), a
      // centre on B's upper edge belonging to B's first line.
      const double aE = 505 + 10 * c, aN = 8995 - 10 * r;
      const double aA = r < 4 && c < 6 ? 100 * r + c : sNull;
      const int aBl = static_cast<int>(std::floor((8985 - aN) / 25)), aBp = static_cast<int>(std::floor((aE - 540) / 25));
      const double aB = aN <= 8985 && aBl < 3 && aE > 540 && aBp < 3 ? 1000 + 10 * aBl + aBp : sNull;
      EXPECT_EQ(aStack.value(0, r, c), aA) << r << "," << c;
      EXPECT_EQ(aStack.value(1, r, c), aB) << r << "," << c;
    }
  // Cells beyond the grid are no data too.
  EXPECT_EQ(aStack.value(0, -1, 0), sNull);
  EXPECT_EQ(aStack.value(1, 0, 11), sNull);
}

TEST_F(GeocodedStackTest, InterpolatorsFollowARampAndFallBackAtTheEdges) {
  // Ramp over 6 x 7 cells of 20 m; a 10 m grid over the same extent.
  auto aRamp = [](double u, double w) { return 3 + 2 * u + 0.5 * w; };
  raster("ramp", 6, 7, 6000, 1000, 20, [&](int l, int p) { return aRamp(l, p); });
  raster("grid", 12, 14, 6000, 1000, 10, [](int, int) { return 0.0; });
  struct SCase {
    const char *mKernel;
    int mReach; // cells the support needs on each side (beyond bilinear: exact anyway)
  } aCases[] = {{"bilinear_interpolation", 0}, {"3th_order_cc", 1}, {"4th_order_cc", 2}, {"sinc_interpolation", 3}};
  for (const SCase &aCase : aCases) {
    CGeocodedImageStack aStack;
    open(aStack, {"ramp"}, "grid", aCase.mKernel);
    for (int r = 0; r < 12; ++r) {
      const std::vector<double> aLine = line(aStack, 0, r);
      for (int c = 0; c < 14; ++c) {
        const double u = inputPosition(r), w = inputPosition(c);
        // Bilinear (exact on a ramp) applies where [floor, floor + 1] is inside.
        const bool aInside = u >= 0 && u < 5 && w >= 0 && w < 6;
        const double aExpected = aInside ? aRamp(u, w) : aRamp(std::floor(u + 0.5), std::floor(w + 0.5));
        const double aTolerance = std::string(aCase.mKernel) == "sinc_interpolation" ? 0.05 : 1e-9;
        EXPECT_NEAR(aLine[c], aExpected, aTolerance) << aCase.mKernel << " " << r << "," << c;
      }
    }
  }
}

TEST_F(GeocodedStackTest, CubicFallsBackToBilinearThenNearestOnAParabola) {
  // v = u^2 along lines: cubic convolution is exact on it, bilinear is not.
  // Grid column 6 (w = 2.75) leaves the cubic room across the pixels.
  raster("parabola", 8, 8, 6000, 1000, 20, [](int l, int) { return double(l * l); });
  raster("grid", 16, 16, 6000, 1000, 10, [](int, int) { return 0.0; });
  CGeocodedImageStack aStack;
  open(aStack, {"parabola"}, "grid", "3th_order_cc");
  for (int r = 15; r >= 0; --r) { // any line order
    const double u = inputPosition(r);
    const double j = std::floor(u);
    double aExpected = std::floor(u + 0.5) * std::floor(u + 0.5); // nearest
    if (j - 1 >= 0 && j + 2 <= 7)
      aExpected = u * u;
    else if (j >= 0 && j + 1 <= 7)
      aExpected = (j + 1 - u) * j * j + (u - j) * (j + 1) * (j + 1);
    EXPECT_NEAR(aStack.value(0, r, 6), aExpected, 1e-9) << r;
  }
}

TEST_F(GeocodedStackTest, NoDataInsideASupportFallsBackAndNoDataStaysNoData) {
  auto aRamp = [](double u, double w) { return 3 + 2 * u + 0.5 * w; };
  raster("holed", 6, 7, 6000, 1000, 20, [&](int l, int p) { return l == 2 && p == 3 ? sNull : aRamp(l, p); });
  raster("grid", 12, 14, 6000, 1000, 10, [](int, int) { return 0.0; });
  for (const char *aKernel : {"bilinear_interpolation", "4th_order_cc"}) {
    CGeocodedImageStack aStack, aByLine;
    open(aStack, {"holed"}, "grid", aKernel);
    open(aByLine, {"holed"}, "grid", aKernel);
    for (int r = 0; r < 12; ++r) {
      const std::vector<double> aLine = line(aByLine, 0, r);
      for (int c = 0; c < 14; ++c) {
        const double u = inputPosition(r), w = inputPosition(c);
        const double ju = std::floor(u), jw = std::floor(w);
        const bool aBilinear = ju >= 0 && ju + 1 <= 5 && jw >= 0 && jw + 1 <= 6 && !(ju <= 2 && 2 <= ju + 1 && jw <= 3 && 3 <= jw + 1);
        const int aNu = static_cast<int>(std::floor(u + 0.5)), aNw = static_cast<int>(std::floor(w + 0.5));
        double aExpected = aNu == 2 && aNw == 3 ? sNull : aRamp(aNu, aNw);
        if (aBilinear)
          aExpected = aRamp(u, w); // bilinear or a higher kernel: exact on the ramp
        EXPECT_NEAR(aStack.value(0, r, c), aExpected, 1e-9) << aKernel << " " << r << "," << c;
        EXPECT_NEAR(aLine[c], aExpected, 1e-9) << aKernel << " line " << r << "," << c;
      }
    }
  }
}

TEST_F(GeocodedStackTest, MeanAndWeightAverageTheCellsUnderTheFootprint) {
  // Input cells of 20 m; grid of 10 m shifted east by 2 m: output column c
  // covers [1002 + 10 c, 1012 + 10 c], overlapping input pixels
  // floor((2 + 10 c) / 20) and floor((12 + 10 c) / 20).
  raster("in", 2, 5, 6000, 1000, 20, [](int l, int p) { return 10.0 * l + p * p; });
  raster("grid", 4, 9, 6000, 1002, 10, [](int, int) { return 0.0; });
  for (const char *aKernel : {"mean", "weight"}) {
    CGeocodedImageStack aStack;
    open(aStack, {"in"}, "grid", aKernel);
    for (int r = 0; r < 4; ++r) {
      const std::vector<double> aLine = line(aStack, 0, r);
      for (int c = 0; c < 9; ++c) {
        const int aLeft = (2 + 10 * c) / 20, aRight = (12 + 10 * c) / 20;
        const double aLeftPart = std::min(10.0, 20.0 * (aLeft + 1) - (2 + 10 * c));
        const double vL = 10.0 * (r / 2) + aLeft * aLeft, vR = 10.0 * (r / 2) + aRight * aRight;
        double aExpected = vL;
        if (aRight != aLeft && aRight < 5)
          aExpected = std::string(aKernel) == "mean" ? (vL + vR) / 2 : (aLeftPart * vL + (10 - aLeftPart) * vR) / 10;
        EXPECT_NEAR(aLine[c], aExpected, 1e-9) << aKernel << " " << r << "," << c;
      }
    }
  }
}

TEST_F(GeocodedStackTest, ClippingStopsTheCubicOvershootAtAStep) {
  raster("step", 8, 8, 6000, 1000, 20, [](int, int p) { return p < 4 ? 0.0 : 10.0; });
  raster("grid", 16, 16, 6000, 1000, 10, [](int, int) { return 0.0; });
  CGeocodedImageStack aFree, aClipped;
  open(aFree, {"step"}, "grid", "3th_order_cc");
  open(aClipped, {"step"}, "grid", "3th_order_cc", 1);
  double aHighest = 0, aLowest = 0;
  for (int c = 0; c < 16; ++c) {
    aHighest = std::max(aHighest, aFree.value(0, 6, c));
    aLowest = std::min(aLowest, aFree.value(0, 6, c));
    EXPECT_GE(aClipped.value(0, 6, c), 0.0) << c;
    EXPECT_LE(aClipped.value(0, 6, c), 10.0) << c;
  }
  EXPECT_GT(aHighest, 10.0);
  EXPECT_LT(aLowest, 0.0);
}

TEST_F(GeocodedStackTest, RegistrationsThatCannotBeUsedAreRefused) {
  raster("south", 3, 3, 6000, 1000, 20, [](int, int) { return 1.0; }, 20);
  raster("grid", 3, 3, 6000, 1000, 20, [](int, int) { return 1.0; });
  CGeocodedImageStack aStack;
  list({"south"});
  EXPECT_FALSE(aStack.initialise(mDir.file("list.txt").c_str(), mDir.file("grid").c_str(), "mean", 1, 0));
  tlrxWriteFile(mDir.file("empty.txt"), "#\n");
  EXPECT_FALSE(aStack.initialise(mDir.file("empty.txt").c_str(), mDir.file("grid").c_str(), "mean", 1, 0));
  EXPECT_EQ(aStack.getInputCount(), 0);

  CDescription aHeader;
  fdfReadStandardHeader(mDir.file("grid").c_str(), aHeader);
  SMapGrid aGrid;
  std::string aProblem;
  aHeader.getField("RegistrationCoordinates.PixelSpacingLonEast").setDouble(0.0);
  EXPECT_FALSE(fdfReadMapGrid(aHeader, aGrid, aProblem));
  EXPECT_EQ(aProblem, "RegistrationCoordinates.PixelSpacingLonEast");
  aHeader.getField("RegistrationCoordinates.LatNorthing").unset();
  EXPECT_FALSE(fdfReadMapGrid(aHeader, aGrid, aProblem));
  EXPECT_EQ(aProblem, "RegistrationCoordinates.LatNorthing");
  aHeader.getField("RasterInfo.NrOfLinesPerImage").setInteger(0);
  EXPECT_FALSE(fdfReadMapGrid(aHeader, aGrid, aProblem));
  EXPECT_EQ(aProblem, "RasterInfo.NrOfLinesPerImage");
  // Through the command's grid builder: the header is refused with its name.
  std::string aMessage;
  EXPECT_EQ(tlrxRaisedCode([&] { fdfBuildTemporalGrid({mDir.file("grid"), mDir.file("south")}, mDir.file("out")); },
                           &aMessage),
            261124);
  EXPECT_EQ(aMessage, mDir.file("south_hdr"));
  EXPECT_FALSE(tlrxFileExists(mDir.file("out.sml")));
}

TEST(MapGrid, UnionCountsWholeCellsDespiteRounding) {
  // 0.1-degree cells: 3 cells end at 0.30000000000000004 and must stay 3.
  SMapGrid a;
  a.mLines = 3;
  a.mPixels = 3;
  a.mEast0 = 0.0;
  a.mNorth0 = 0.3;
  a.mEastStep = 0.1;
  a.mNorthStep = -0.1;
  SMapGrid b = a;
  b.mEast0 = 0.1;
  b.mPixels = 2;
  SMapGrid aUnion;
  ASSERT_TRUE(fdfUnionMapGrid({a, b}, aUnion));
  EXPECT_EQ(aUnion.mPixels, 3);
  EXPECT_EQ(aUnion.mLines, 3);
  // A half cell left over is not a cell.
  b.mEast0 = 0.35;
  ASSERT_TRUE(fdfUnionMapGrid({a, b}, aUnion));
  EXPECT_EQ(aUnion.mPixels, 5);
  // Extents that would need more cells than a raster may hold are refused.
  b.mEast0 = 1e9;
  EXPECT_FALSE(fdfUnionMapGrid({a, b}, aUnion));
  // Equal grids map cell to cell exactly; a finer grid onto cell centres.
  EXPECT_EQ(fdfCellCentrePosition(7, 0.3, -0.1, 0.3, -0.1), 7.0);
  EXPECT_DOUBLE_EQ(fdfCellCentrePosition(3, 100, 10, 100, 20), 1.25);
}

