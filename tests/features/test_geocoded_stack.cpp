// Geocoded image stack and map grids: the union grid of overlapping inputs,
// values landing at the right cells, each kernel on surfaces it reproduces
// and the fallbacks at holes and edges.
#include "tlrx_command_test_support.h"
#include "tlrx_geocoded_stack.h"
#include "tlrx_map_grid.h"
#include "tlrx_temporal_grid.h"
#include "tlrx_temporal_test_support.h"

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
    STLRXTestRaster aRaster{theLines, thePixels, {}, "DOUBLE", "POWER", true, sNull, tlrxAcquisitionText(0)};
    for (int l = 0; l < theLines; ++l)
      for (int p = 0; p < thePixels; ++p)
        aRaster.mValues.push_back(theValue(l, p));
    tlrxWriteTestRaster(mDir.file(theName), aRaster);
    tlrxGeocodeTestRaster(mDir.file(theName), theNorth0, theEast0, theNorthStep != 0 ? theNorthStep : -theStep,
                          theStep);
  }
  // A grid header of theLines x thePixels cells of theStep from (theEast0, 6000).
  void grid(int theLines, int thePixels, double theEast0, double theStep) {
    raster("grid", theLines, thePixels, 6000, theEast0, theStep, [](int, int) { return 0.0; });
  }
  // Stack of theNames on the header "grid" with kernel theKernel; the list
  // ends with the "#" line of the host's lists.
  void open(CGeocodedImageStack &theStack, const std::vector<std::string> &theNames, const char *theKernel,
            int theClip = 0) {
    std::string aList;
    for (const std::string &aName : theNames)
      aList += mDir.file(aName) + "\n";
    tlrxWriteFile(mDir.file("list.txt"), aList + "#\n");
    ASSERT_TRUE(theStack.initialise(mDir.file("list.txt").c_str(), mDir.file("grid").c_str(), theKernel, 1, theClip));
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

double ramp(double theU, double theW) { return 3 + 2 * theU + 0.5 * theW; }

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
  EXPECT_EQ(std::vector<double>({1.0 * aGrid.mLines, 1.0 * aGrid.mPixels, aGrid.mNorth0, aGrid.mEast0, aGrid.mNorthStep,
                                 aGrid.mEastStep}),
            std::vector<double>({9, 11, 9000, 500, -10, 10}));
  EXPECT_STREQ(aHeader.getField("RasterInfo.CellType").getString(), "FLOAT");
  CGeocodedImageStack aStack;
  open(aStack, {"A", "B"}, "nearest_neighbour");
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

TEST_F(GeocodedStackTest, InterpolatorsFollowARampAndFallBackAtTheEdgesAndAtNoData) {
  // Ramp over 6 x 7 cells of 20 m; a 10 m grid over the same extent.
  raster("ramp", 6, 7, 6000, 1000, 20, ramp);
  grid(12, 14, 1000, 10);
  for (const std::string aKernel : {"bilinear_interpolation", "3th_order_cc", "4th_order_cc", "sinc_interpolation"}) {
    CGeocodedImageStack aStack;
    open(aStack, {"ramp"}, aKernel.c_str());
    for (int r = 0; r < 12; ++r) {
      const std::vector<double> aLine = line(aStack, 0, r);
      for (int c = 0; c < 14; ++c) {
        const double u = inputPosition(r), w = inputPosition(c);
        // Bilinear (exact on a ramp) applies where [floor, floor + 1] is inside.
        const bool aInside = u >= 0 && u < 5 && w >= 0 && w < 6;
        const double aExpected = aInside ? ramp(u, w) : ramp(std::floor(u + 0.5), std::floor(w + 0.5));
        EXPECT_NEAR(aLine[c], aExpected, aKernel[0] == 's' ? 0.05 : 1e-9) << aKernel << " " << r << "," << c;
      }
    }
  }
  // No data inside a support falls back; no data stays no data.
  raster("holed", 6, 7, 6000, 1000, 20, [&](int l, int p) { return l == 2 && p == 3 ? sNull : ramp(l, p); });
  for (const char *aKernel : {"bilinear_interpolation", "4th_order_cc"}) {
    CGeocodedImageStack aStack, aByLine;
    open(aStack, {"holed"}, aKernel);
    open(aByLine, {"holed"}, aKernel);
    for (int r = 0; r < 12; ++r) {
      const std::vector<double> aLine = line(aByLine, 0, r);
      for (int c = 0; c < 14; ++c) {
        const double u = inputPosition(r), w = inputPosition(c);
        const double ju = std::floor(u), jw = std::floor(w);
        const bool aBilinear = ju >= 0 && ju + 1 <= 5 && jw >= 0 && jw + 1 <= 6 && !(ju <= 2 && 2 <= ju + 1 && jw <= 3 && 3 <= jw + 1);
        const int aNu = static_cast<int>(std::floor(u + 0.5)), aNw = static_cast<int>(std::floor(w + 0.5));
        double aExpected = aNu == 2 && aNw == 3 ? sNull : ramp(aNu, aNw);
        if (aBilinear)
          aExpected = ramp(u, w); // bilinear or a higher kernel: exact on the ramp
        EXPECT_NEAR(aStack.value(0, r, c), aExpected, 1e-9) << aKernel << " " << r << "," << c;
        EXPECT_NEAR(aLine[c], aExpected, 1e-9) << aKernel << " line " << r << "," << c;
      }
    }
  }
}

TEST_F(GeocodedStackTest, CubicFallsBackToBilinearThenNearestOnAParabolaAndClipsItsOvershoot) {
  // v = u^2 along lines: cubic convolution is exact on it, bilinear is not.
  // Grid column 6 (w = 2.75) leaves the cubic room across the pixels.
  raster("parabola", 8, 8, 6000, 1000, 20, [](int l, int) { return double(l * l); });
  grid(16, 16, 1000, 10);
  CGeocodedImageStack aStack;
  open(aStack, {"parabola"}, "3th_order_cc");
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
  // At a step the cubic overshoots on both sides; clipping keeps it within.
  raster("step", 8, 8, 6000, 1000, 20, [](int, int p) { return p < 4 ? 0.0 : 10.0; });
  CGeocodedImageStack aFree, aClipped;
  open(aFree, {"step"}, "3th_order_cc");
  open(aClipped, {"step"}, "3th_order_cc", 1);
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

TEST_F(GeocodedStackTest, MeanAndWeightAverageTheCellsUnderTheFootprint) {
  // Input cells of 20 m; grid of 10 m shifted east by 2 m: output column c
  // covers [1002 + 10 c, 1012 + 10 c], overlapping input pixels
  // floor((2 + 10 c) / 20) and floor((12 + 10 c) / 20).
  raster("in", 2, 5, 6000, 1000, 20, [](int l, int p) { return 10.0 * l + p * p; });
  grid(4, 9, 1002, 10);
  std::vector<std::vector<double>> aLines;
  for (const char *aKernel : {"mean", "weight"}) {
    CGeocodedImageStack aStack;
    open(aStack, {"in"}, aKernel);
    for (int r = 0; r < 4; ++r) {
      const std::vector<double> aLine = line(aStack, 0, r);
      aLines.push_back(aLine);
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
  // The same grid begun two columns west: those two lie outside the input,
  // the others repeat the lines above.
  grid(4, 11, 982, 10);
  size_t k = 0;
  for (const char *aKernel : {"mean", "weight"}) {
    CGeocodedImageStack aStack;
    open(aStack, {"in"}, aKernel);
    for (int r = 0; r < 4; ++r, ++k) {
      const std::vector<double> aLine = line(aStack, 0, r);
      EXPECT_EQ(aLine[0], sNull);
      EXPECT_EQ(aLine[1], sNull);
      for (int c = 0; c < 9; ++c)
        EXPECT_EQ(aLine[c + 2], aLines[k][c]) << aKernel << " " << r << "," << c;
    }
  }
}

TEST_F(GeocodedStackTest, RegistrationsThatCannotBeUsedAreRefused) {
  raster("south", 3, 3, 6000, 1000, 20, [](int, int) { return 1.0; }, 20);
  grid(3, 3, 1000, 20);
  CGeocodedImageStack aStack;
  tlrxWriteFile(mDir.file("list.txt"), mDir.file("south") + "\n#\n");
  EXPECT_FALSE(aStack.initialise(mDir.file("list.txt").c_str(), mDir.file("grid").c_str(), "mean", 1, 0));
  tlrxWriteFile(mDir.file("empty.txt"), "#\n");
  EXPECT_FALSE(aStack.initialise(mDir.file("empty.txt").c_str(), mDir.file("grid").c_str(), "mean", 1, 0));
  EXPECT_EQ(aStack.getInputCount(), 0);
  CDescription aHeader;
  fdfReadStandardHeader(mDir.file("grid").c_str(), aHeader);
  SMapGrid aGrid;
  std::string aProblem;
  // Each change refuses the grid with a key read before those changed already.
  const std::pair<const char *, std::function<void(CDescriptionField &)>> aChanges[] = {
      {"RegistrationCoordinates.PixelSpacingLonEast", [](CDescriptionField &theField) { theField.setDouble(0.0); }},
      {"RegistrationCoordinates.LatNorthing", [](CDescriptionField &theField) { theField.unset(); }},
      {"RasterInfo.NrOfLinesPerImage", [](CDescriptionField &theField) { theField.setInteger(0); }}};
  for (const auto &aChange : aChanges) {
    aChange.second(aHeader.getField(aChange.first));
    EXPECT_FALSE(fdfReadMapGrid(aHeader, aGrid, aProblem));
    EXPECT_EQ(aProblem, aChange.first);
  }
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
  const SMapGrid a{3, 3, 0.3, 0.0, -0.1, 0.1};
  SMapGrid b{3, 2, 0.3, 0.1, -0.1, 0.1}, aUnion;
  ASSERT_TRUE(fdfUnionMapGrid({a, b}, aUnion));
  EXPECT_EQ(std::make_pair(aUnion.mLines, aUnion.mPixels), std::make_pair(3, 3));
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

