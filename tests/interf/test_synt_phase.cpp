// Synthetic phase: fringes simulated here (single-look pairs of coherence g
// times a known phase screen) are followed by the written phase; the height
// term is recovered from a simulated scene; pure noise and no data give 0;
// the step's arguments, header, log, failures and closing.
#include "tlrx_description_section.h"
#include "tlrx_errors.h"
#include "tlrx_header_expect.h"
#include "tlrx_slc_test_support.h"
#include "tlrx_standard_header.h"
#include "tlrx_synt_phase.h"
#include "tlrx_test_support.h"
#include "tlrx_trace_test_support.h"

#include <gtest/gtest.h>

#include <cmath>
#include <complex>
#include <functional>
#include <random>

namespace {

using TPhaseScreen = std::function<double(double, double)>; // (x, y) -> radians
constexpr int CTLRX_LINES = 256, CTLRX_PIXELS = 320;
constexpr double CTLRX_TWO_PI = 2 * M_PI;

// Two hills of 300 and 200 height units.
double hills(double theX, double theY) {
  const auto aHill = [&](double theCx, double theCy, double theSigma) {
    return std::exp(-((theX - theCx) * (theX - theCx) + (theY - theCy) * (theY - theCy)) / (2 * theSigma * theSigma));
  };
  return 300 * aHill(100, 80, 30) + 200 * aHill(230, 170, 40);
}

// A single-look interferogram: s1 = m, s2 = g m + sqrt(1 - g^2) n (complex
// Gaussian m, n), z = s1 conj(s2) / |s1 s2| e^(i phase); and z e^(-i phase),
// the fringe removed by its truth.
struct SSimulated {
  int mLines = CTLRX_LINES, mPixels = CTLRX_PIXELS;
  std::vector<std::complex<float>> mZ;
  std::vector<std::complex<double>> mFlatTruth;
};
SSimulated simulate(double theG, const TPhaseScreen &thePhase, unsigned theSeed, int theLines = CTLRX_LINES,
                    int thePixels = CTLRX_PIXELS) {
  std::mt19937 aRandom(theSeed);
  std::normal_distribution<double> aNormal;
  SSimulated aSim{theLines, thePixels, {}, {}};
  for (int y = 0; y < theLines; ++y)
    for (int x = 0; x < thePixels; ++x) {
      const std::complex<double> m(aNormal(aRandom), aNormal(aRandom)), n(aNormal(aRandom), aNormal(aRandom));
      const std::complex<double> s2 = theG * m + std::sqrt(1 - theG * theG) * n, aNoise = m * std::conj(s2);
      aSim.mFlatTruth.push_back(aNoise / std::abs(aNoise));
      aSim.mZ.emplace_back(aSim.mFlatTruth.back() * std::polar(1.0, thePhase(x, y)));
    }
  return aSim;
}

class SyntPhase : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }

  // R + "_int" from theSim with its looks, and a master power image of
  // theLines x thePixels cells (the interferogram's size by default).
  void writeInputs(const std::string &theRoot, const SSimulated &theSim, int theAzimuthLooks = 0,
                   int theMasterLines = 0) {
    STLRXTestRaster aZ;
    aZ.mLines = theSim.mLines;
    aZ.mPixels = theSim.mPixels;
    aZ.mCellType = "FLOAT_COMPLEX";
    aZ.mDataUnits = "INTERFEROGRAMME";
    aZ.mHasNull = true;
    aZ.mCells = theSim.mZ;
    tlrxWriteTestRaster(mDir.file(theRoot + "_int"), aZ);
    if (theAzimuthLooks > 0) {
      CDescription aHeader;
      fdfReadStandardHeader(mDir.file(theRoot + "_int").c_str(), aHeader);
      aHeader.getField("Processing.NAzimuthLooks").setInteger(theAzimuthLooks);
      aHeader.getField("Processing.NRangeLooks").setInteger(1);
      ASSERT_TRUE(fdfWriteStandardHeader(mDir.file(theRoot + "_int").c_str(), aHeader));
    }
    writeReal(theRoot + "_pwr", theMasterLines > 0 ? theMasterLines : theSim.mLines, theSim.mPixels,
              [](int, int) { return 1.0; });
  }
  std::string writeReal(const std::string &theName, int theLines, int thePixels,
                        const std::function<double(int, int)> &theValue, const std::string &theType = "FLOAT",
                        bool theNull = false) {
    STLRXTestRaster aRaster;
    aRaster.mLines = theLines;
    aRaster.mPixels = thePixels;
    aRaster.mCellType = theType;
    aRaster.mDataUnits = "DEM";
    aRaster.mHasNull = theNull;
    aRaster.mNull = -9999;
    for (int y = 0; y < theLines; ++y)
      for (int x = 0; x < thePixels; ++x)
        aRaster.mValues.push_back(theValue(x, y));
    if (theType == "FLOAT_COMPLEX")
      aRaster.mCells.assign(aRaster.mValues.begin(), aRaster.mValues.end());
    tlrxWriteTestRaster(mDir.file(theName), aRaster);
    return mDir.file(theName);
  }
  // The chain's 23 arguments for root theRoot.
  std::vector<std::string> args(const std::string &theRoot, const std::string &theDem = "NotOK") const {
    return {mDir.file(theRoot + "_pwr"), mDir.file(theRoot + "_spwr"), "NotOK", theDem, "NotOK", "5", "3", "2",
            mDir.file(theRoot), "NotOK", "NotOK", "NotOK", "NotOK", "7.5", "NotOK", "NotOK", mDir.file("par"),
            "1", "1", "OK", "NotOK", "NotOK", "NotOK"};
  }
  std::vector<double> run(const std::string &theRoot, const std::string &theDem = "NotOK") {
    std::vector<std::string> aArgs = args(theRoot, theDem);
    aArgs.insert(aArgs.begin(), "tlrx_split_synt_phase");
    EXPECT_EQ(tlrxCallStep(tlrx_split_synt_phase, aArgs), 0);
    return tlrxReadTestRaster(mDir.file(theRoot + "_sint"));
  }
  std::string log() const { return tlrxReadFile(mDir.file("Process.log")); }
};

// Max |phi - truth - mean| (wrapped) over cells at least theMargin from every
// border, theSkip cells excluded; no-data cells count: phi is defined there.
double interiorResidual(const std::vector<double> &thePhi, const TPhaseScreen &theTruth, const SSimulated &theSim,
                        int theMargin, const std::function<bool(int, int)> &theSkip = nullptr) {
  const auto aDiff = [&](int x, int y) { return thePhi[size_t(y) * theSim.mPixels + x] - theTruth(x, y); };
  std::complex<double> aMean;
  for (int y = theMargin; y < theSim.mLines - theMargin; ++y)
    for (int x = theMargin; x < theSim.mPixels - theMargin; ++x)
      aMean += std::polar(1.0, aDiff(x, y));
  double aMax = 0.0;
  for (int y = theMargin; y < theSim.mLines - theMargin; ++y)
    for (int x = theMargin; x < theSim.mPixels - theMargin; ++x)
      if (!(theSkip && theSkip(x, y)))
        aMax = std::max(aMax, std::fabs(std::arg(std::polar(1.0, aDiff(x, y) - std::arg(aMean)))));
  return aMax;
}

} // namespace

// The written phase follows the fringes: its gradient matches the truth's
// within 0.002 cycles per cell away from the borders, the residual is small,
// and flattening by it keeps the coherent mean of flattening by the truth
// with a phase near 0. Partial blocks (kept from half a block on) and a
// no-data square do not disturb it.
TEST_F(SyntPhase, FollowsTheFringes) {
  const TPhaseScreen aLinear = [](double x, double y) { return CTLRX_TWO_PI * (0.1 * x - 0.03 * y); };
  const TPhaseScreen aCurved = [](double x, double y) {
    const double u = x - 160, v = y - 128;
    return CTLRX_TWO_PI * (0.04 * x - 0.02 * y + 1.5e-4 * u * u + 1e-4 * u * v - 1.2e-4 * v * v);
  };
  const auto aSquare = [](int x, int y) { return x >= 100 && x < 160 && y >= 80 && y < 140; };
  struct SCase {
    const char *mName;
    const TPhaseScreen *mPhase;
    double mG;
    int mLines, mPixels;
    bool mHole;
  } aCases[] = {{"linear g 0.6", &aLinear, 0.6, CTLRX_LINES, CTLRX_PIXELS, false},
                {"partial blocks", &aLinear, 0.6, 270, 300, false}, // 14 lines dropped, 44 columns kept
                {"no-data square", &aLinear, 0.6, CTLRX_LINES, CTLRX_PIXELS, true},
                {"quadratic g 0.8", &aCurved, 0.8, CTLRX_LINES, CTLRX_PIXELS, false}};
  for (const SCase &aCase : aCases) {
    SCOPED_TRACE(aCase.mName);
    SSimulated aSim = simulate(aCase.mG, *aCase.mPhase, 5, aCase.mLines, aCase.mPixels);
    for (int y = 0; y < aSim.mLines && aCase.mHole; ++y)
      for (int x = 0; x < aSim.mPixels; ++x)
        if (aSquare(x, y))
          aSim.mZ[size_t(y) * aSim.mPixels + x] = 0;
    writeInputs("f", aSim);
    const size_t aBefore = log().size();
    const std::vector<double> aPhi = run("f");
    EXPECT_NE(log().substr(aBefore).find("\nsynthetic phase: 20 of 20 blocks kept\npolynomial degree 3"),
              std::string::npos);
    const auto at = [&](int x, int y) { return aPhi[size_t(y) * aSim.mPixels + x]; };
    double aWorst = 0.0;
    for (int y = 32; y < aSim.mLines - 32; ++y)
      for (int x = 32; x < aSim.mPixels - 32; ++x) {
        const TPhaseScreen &t = *aCase.mPhase;
        aWorst = std::max({aWorst, std::fabs((at(x + 1, y) - at(x, y)) - (t(x + 1, y) - t(x, y))),
                           std::fabs((at(x, y + 1) - at(x, y)) - (t(x, y + 1) - t(x, y)))});
      }
    EXPECT_LT(aWorst / CTLRX_TWO_PI, 0.002);
    EXPECT_LT(interiorResidual(aPhi, *aCase.mPhase, aSim, 32), 0.3);
    std::complex<double> aFlat, aTruth;
    for (size_t i = 0; i < aPhi.size(); ++i)
      if (aSim.mZ[i] != std::complex<float>()) {
        aFlat += std::complex<double>(aSim.mZ[i]) * std::polar(1.0, -aPhi[i]);
        aTruth += aSim.mFlatTruth[i];
      }
    EXPECT_GT(std::abs(aFlat), 0.98 * std::abs(aTruth));
    EXPECT_LT(std::fabs(std::arg(aFlat)), 0.05);
  }
}

// The height term from a simulated scene without files: k within 5 % and a
// small residual; the polynomial alone cannot follow the hills, and heights
// unknown everywhere leave the fit to it.
TEST_F(SyntPhase, RecoversTheHeightTerm) {
  const double aK = 0.02;
  const TPhaseScreen aPhase = [&](double x, double y) { return CTLRX_TWO_PI * 0.05 * x + aK * hills(x, y); };
  const SSimulated aSim = simulate(0.8, aPhase, 9);
  struct SCase {
    bool mWithHeight;
    uint8_t mKnown;
    bool mFitsK;
  } aCases[] = {{true, 1, true}, {false, 1, false}, {true, 0, false}};
  for (const SCase &aCase : aCases) {
    SCOPED_TRACE(std::to_string(aCase.mWithHeight) + std::to_string(aCase.mKnown));
    CSyntBlockEstimator aEstimator(CTLRX_LINES, CTLRX_PIXELS, aCase.mWithHeight);
    std::vector<double> aHeights(CTLRX_PIXELS);
    const std::vector<uint8_t> aKnown(CTLRX_PIXELS, aCase.mKnown);
    for (int y = 0; y < CTLRX_LINES; ++y) {
      for (int x = 0; x < CTLRX_PIXELS; ++x)
        aHeights[size_t(x)] = hills(x, y);
      aEstimator.pushLine(&aSim.mZ[size_t(y) * CTLRX_PIXELS], aHeights.data(), aKnown.data());
    }
    aEstimator.finish();
    const SSyntPhaseModel aModel =
        fdfFitSyntPhase(aEstimator.blocks(), aEstimator.examined(), CTLRX_LINES, CTLRX_PIXELS, aCase.mWithHeight);
    EXPECT_EQ(aModel.mBlocks, 20);
    EXPECT_EQ(aModel.mKept, 20);
    EXPECT_EQ(aModel.mHasHeight, aCase.mFitsK);
    if (aCase.mFitsK)
      EXPECT_NEAR(aModel.mK, aK, 0.05 * aK);
    std::vector<double> aPhi;
    for (int y = 0; y < CTLRX_LINES; ++y)
      for (int x = 0; x < CTLRX_PIXELS; ++x)
        aPhi.push_back(aModel.phase(x, y, hills(x, y), true));
    const double aResidual = interiorResidual(aPhi, aPhase, aSim, 32);
    if (aCase.mFitsK)
      EXPECT_LT(aResidual, 0.3);
    else
      EXPECT_GT(aResidual, 1.0);
  }
}

// The step with an elevation raster on the master grid (2 azimuth looks,
// the two lines of a cell differing by +-20 in opposite signs, so only their
// mean is the height): the phase follows fringe and hills; where a height is
// unknown (the declared null in one line, NaN in both) the height term is
// left out. The header names both sources and declares no null value.
TEST_F(SyntPhase, UsesTheElevationModelOnTheMasterGrid) {
  const double aK = 0.02;
  const TPhaseScreen aPhase = [&](double x, double y) { return CTLRX_TWO_PI * 0.05 * x + aK * hills(x, y); };
  const auto aHole = [](int x, int y) { return x >= 96 && x < 104 && y >= 76 && y < 84; };
  const SSimulated aSim = simulate(0.8, aPhase, 3);
  writeInputs("d", aSim, 2);
  const std::string aDem = writeReal("dem", 2 * CTLRX_LINES, CTLRX_PIXELS, [&](int x, int r) {
    if (aHole(x, r / 2))
      return x < 100 && r % 2 == 0 ? -9999.0 : (x < 100 ? 5.0 : std::nan(""));
    return hills(x, r / 2) + ((x + r) % 2 == 0 ? 20.0 : -20.0);
  }, "FLOAT", true);
  const std::vector<double> aPhi = run("d", aDem);
  EXPECT_LT(interiorResidual(aPhi, aPhase, aSim, 32, aHole), 0.3);
  const TPhaseScreen aWithoutHeights = [&](double x, double y) {
    return aHole(int(x), int(y)) ? aPhase(x, y) - aK * hills(x, y) : aPhase(x, y);
  };
  EXPECT_LT(interiorResidual(aPhi, aWithoutHeights, aSim, 32), 0.4);
  const std::string aLog = log(), aKey = "\nheight term k: ";
  ASSERT_NE(aLog.find(aKey), std::string::npos);
  EXPECT_NEAR(std::atof(aLog.c_str() + aLog.find(aKey) + aKey.size()), aK, 0.05 * aK);
  tlrxExpectHeader(mDir.file("d_sint"), "CellType=FLOAT;DataUnits=SYNTHETIC INTERFEROGRAMME;NrOfLinesPerImage=256;"
                                        "NrOfPixelsPerLine=320;NullCellValue=;HeaderOffset=0;FilesList=" +
                                            mDir.file("d_int") + "," + aDem);
}

// No fringe to follow: pure noise keeps no block, an all-zero interferogram
// none either, nor a fringe with fewer than half its cells valid; the phase
// is 0 everywhere and the log says why.
TEST_F(SyntPhase, NoFringeGivesAZeroPhase) {
  const TPhaseScreen aFringe = [](double x, double) { return 0.3 * x; };
  SSimulated aNoise = simulate(0.0, aFringe, 21), aZero = aNoise, aSparse = simulate(0.9, aFringe, 22, 64, 64);
  std::fill(aZero.mZ.begin(), aZero.mZ.end(), std::complex<float>());
  for (size_t i = 0; i < aSparse.mZ.size(); ++i)
    if (i % 2 == 0 || i % 16 == 1) // 7 valid cells of 16, in both halves
      aSparse.mZ[i] = 0;
  const std::pair<const SSimulated *, const char *> aCases[] = {{&aNoise, "0 of 20"}, {&aZero, "0 of 20"},
                                                                {&aSparse, "0 of 1"}};
  for (const auto &aCase : aCases) {
    SCOPED_TRACE(aCase.second);
    writeInputs("n", *aCase.first);
    const size_t aBefore = log().size();
    const std::vector<double> aPhi = run("n");
    ASSERT_EQ(aPhi.size(), aCase.first->mZ.size());
    for (double aValue : aPhi)
      ASSERT_EQ(aValue, 0.0);
    EXPECT_NE(log().substr(aBefore).find(std::string("\nsynthetic phase: ") + aCase.second +
                                         " blocks kept\nno significant fringe found: synthetic phase 0"),
              std::string::npos);
    tlrxExpectHeader(mDir.file("n_sint"), "FilesList=" + mDir.file("n_int"));
  }
}

// The interferogram is derived from the root and said so; every argument
// not read is logged by name.
TEST_F(SyntPhase, LogsTheDerivedInterferogramAndTheUnusedArguments) {
  writeInputs("a", simulate(0.9, [](double x, double) { return 0.5 * x; }, 1, 64, 64));
  ASSERT_TRUE(tlrxStartTrace());
  run("a");
  const std::string aTrace = tlrxStopTrace(mDir.path()), aLog = log();
  for (const std::string &aLine : std::vector<std::string>{
           "\ninterferogram (from the output root): [" + mDir.file("a_int") + "]",
        "\nnot used: elevation model [NotOK]", "\nnot used: ground control points [NotOK]",
        "\nnot used: synt_phase_interp_box_size [5]", "\nnot used: synt_resamp_grid_size [7.5]",
        "\nnot used: co-registration parameter file [" + mDir.file("par") + "]", "\nnot used: argument 23 [NotOK]",
        "\nsynthetic phase: 1 of 1 blocks kept\npolynomial degree 1"}) {
    EXPECT_NE(aLog.find(aLine), std::string::npos) << aLine;
    EXPECT_NE(aTrace.find(aLine), std::string::npos) << aLine;
  }
}

TEST_F(SyntPhase, FailuresRaiseTheirCodes) {
  const SSimulated aSim = simulate(0.9, [](double x, double) { return 0.5 * x; }, 2, 16, 16);
  writeInputs("o", aSim);
  writeInputs("m", aSim, 0, 15);
  const std::string aComplex = writeReal("cdem", 16, 16, [](int, int) { return 1.0; }, "FLOAT_COMPLEX");
  const std::string aShort = writeReal("sdem", 15, 16, [](int, int) { return 1.0; });
  const std::string aClash = writeReal("c_sint", 16, 16, [](int, int) { return 1.0; });
  const auto aWith = [&](std::vector<std::string> theArgs, size_t theIndex, const std::string &theValue) {
    theArgs[theIndex - 1] = theValue;
    return theArgs;
  };
  std::vector<std::string> aTooFew = args("o");
  aTooFew.pop_back();
  const std::string m = mDir.file("m");
  tlrxExpectStepFailures(
      tlrx_split_synt_phase,
      {
          {aTooFew, CTLRX_ERR_ARGUMENTS, ""},
          {args("none"), CTLRX_ERR_FILE_OPEN, mDir.file("none_int") + "_hdr"},
          {aWith(args("o"), 6, "5x"), CTLRX_ERR_ARGUMENTS, "synt_phase_interp_box_size: not an integer [5x]"},
          {aWith(args("o"), 14, "fine"), CTLRX_ERR_ARGUMENTS, "synt_resamp_grid_size: not a number [fine]"},
          {args("o", aComplex), CTLRX_ERR_IMAGES_INCOMPATIBLE, "FLOAT_COMPLEX (elevation model " + aComplex + ")"},
          {args("o", aShort), CTLRX_ERR_SIZE_MISMATCH, aShort + ": 15 x 16, the interferogram 16 x 16 at 1 x 1 looks"},
          {args("o", mDir.file("nodem")), CTLRX_ERR_FILE_OPEN, mDir.file("nodem") + "_hdr"},
          {aWith(args("o"), 1, m + "_pwr"), CTLRX_ERR_SIZE_MISMATCH, m + "_pwr: 15 x 16, the interferogram 16 x 16"},
          {aWith(args("c"), 1, aClash), CTLRX_ERR_PARAMETER_FILE, aClash},
      },
      mDir.file("o_sint"));
  EXPECT_EQ(tlrxReadTestRaster(aClash), std::vector<double>(16 * 16, 1.0));
}

// The closing removes nothing: the flattening still needs the phase.
TEST_F(SyntPhase, ClosingRemovesNothing) {
  writeInputs("s", simulate(0.9, [](double x, double) { return 0.5 * x; }, 4, 16, 16));
  run("s");
  for (const size_t aCount : {size_t(21), size_t(22), size_t(23)}) {
    std::vector<std::string> aArgs = args("s");
    aArgs.resize(aCount);
    aArgs.insert(aArgs.begin(), "tlrx_split_synt_phase_close");
    ASSERT_TRUE(tlrxStartTrace());
    EXPECT_EQ(tlrxCallStep(tlrx_split_synt_phase_close, aArgs), 0);
    EXPECT_NE(tlrxStopTrace(mDir.path()).find(aCount < 22 ? "\nSHUT: 22 arguments, 23 wanted: nothing removed\n"
                                                          : "\nSHUT\n"),
              std::string::npos);
    for (const char *aFile : {"s_sint", "s_sint.sml", "s_int", "s_pwr"})
      EXPECT_TRUE(tlrxFileExists(mDir.file(aFile))) << aFile;
  }
}

// Heights on the interferogram's grid: the mean of each A x R box (unknown
// when any height in it is no data), pixel p / f for a range-oversampled
// interferogram, and sizes that cannot cover the grid refused.
TEST(SyntPhaseHeights, LooksOfTheElevationModel) {
  SHeightLooks aLooks;
  EXPECT_FALSE(fdfHeightLooks(10, 4, 19, 8, 2, 2, aLooks)); // 20 lines needed
  EXPECT_FALSE(fdfHeightLooks(10, 5, 20, 8, 2, 2, aLooks)); // 10 pixels needed, 5 not a multiple of 8
  EXPECT_FALSE(fdfHeightLooks(10, 12, 20, 8, 2, 1, aLooks)); // neither looks nor a multiple
  ASSERT_TRUE(fdfHeightLooks(10, 16, 20, 8, 2, 3, aLooks)); // 2 cells per elevation pixel
  EXPECT_EQ(aLooks.mOversampling, 2);
  const double aRows[] = {1, 2, 3, 4, 5, 6, 7, 8, 3, 4, 5, 6, 7, 8, 9, -9999};
  double aHeights[16];
  uint8_t aKnown[16];
  fdfMultilookHeights(aRows, 8, aLooks, SNoData(-9999), 16, aHeights, aKnown);
  for (int p = 0; p < 16; ++p) {
    SCOPED_TRACE(p);
    EXPECT_EQ(aKnown[p], p < 14 ? 1 : 0);
    EXPECT_EQ(aHeights[p], p < 14 ? (aRows[p / 2] + aRows[8 + p / 2]) / 2 : 0.0);
  }
  ASSERT_TRUE(fdfHeightLooks(10, 2, 20, 8, 2, 3, aLooks));
  const double aNaN[] = {1, 2, 3, 4, 5, 6, 7, 8, 3, 4, 5, 6, std::nan(""), 8, 9, -9999};
  fdfMultilookHeights(aNaN, 8, aLooks, SNoData(std::nan("")), 2, aHeights, aKnown);
  EXPECT_EQ(aKnown[0], 1); // no declared null: -9999 is a height, outside both boxes anyway
  EXPECT_EQ(aHeights[0], (1 + 2 + 3 + 3 + 4 + 5) / 6.0);
  EXPECT_EQ(aKnown[1], 0); // the NaN at pixel 4
  EXPECT_EQ(aHeights[1], 0.0);
}
