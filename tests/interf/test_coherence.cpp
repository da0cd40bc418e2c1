// Coherence estimation: the measure through the window ring against Touzi's
// expectation on white single-look speckle and against direct sums; the step
// in throw mode with local-frequency removal, its switches, processing
// window, header, failures and closing operation.
#include "tlrx_cc_ave.h"
#include "tlrx_coherence_measure.h"
#include "tlrx_description_section.h"
#include "tlrx_description_test_support.h"
#include "tlrx_description_xml.h"
#include "tlrx_standard_header.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_flattening.h"
#include "tlrx_header_expect.h"
#include "tlrx_slc_test_support.h"
#include "tlrx_test_support.h"
#include "tlrx_trace_test_support.h"
#include "tlrx_window_sums.h"

#include <gtest/gtest.h>

#include <cmath>
#include <complex>
#include <functional>
#include <random>

namespace {

using TCell = std::complex<float>;
constexpr double sPi = 3.14159265358979323846;

// A pair of white circular Gaussian images of coherence theCoherence as the
// chain hands them over: the normalised product z = m conj(s) / |m s| with
// the phase theFringe (radians, of line and pixel) added, and the powers.
struct SPair {
  int mLines, mPixels;
  std::vector<TCell> mZ;
  std::vector<float> mM, mS;
};
SPair whitePair(int theLines, int thePixels, double theCoherence, unsigned theSeed,
                const std::function<double(int, int)> &theFringe = nullptr) {
  std::mt19937 aRandom(theSeed);
  std::normal_distribution<double> aNormal(0.0, std::sqrt(0.5));
  SPair aPair{theLines, thePixels, {}, {}, {}};
  for (int l = 0; l < theLines; ++l)
    for (int p = 0; p < thePixels; ++p) {
      const std::complex<double> a(aNormal(aRandom), aNormal(aRandom)), n(aNormal(aRandom), aNormal(aRandom));
      const std::complex<double> m = a, s = theCoherence * a + std::sqrt(1 - theCoherence * theCoherence) * n;
      const std::complex<double> z = m * std::conj(s) * std::polar(1.0, theFringe ? theFringe(l, p) : 0.0);
      aPair.mZ.push_back(TCell(z / std::abs(z)));
      aPair.mM.push_back(float(std::norm(m)));
      aPair.mS.push_back(float(std::norm(s)));
    }
  return aPair;
}

// The measure over the whole pair through the window ring (Wr columns, Wa
// lines), pixels with theInvalid[i] set made invalid.
std::vector<float> ringCoherence(SPair thePair, int theWr, int theWa, const std::vector<uint8_t> &theBad = {}) {
  const int n = thePair.mPixels;
  CWindowRing aRing({theWa, theWr, ETLRXWindowBorder::kNull}, thePair.mLines, n, CTLRX_COHERENCE_CHANNELS);
  const std::vector<double *> aTerms = aRing.termArrays();
  const std::vector<const double *> aSums = aRing.columnArrays();
  std::vector<float> aOut(size_t(thePair.mLines) * n);
  std::vector<uint8_t> aInvalid(static_cast<size_t>(n)), aOk(static_cast<size_t>(n), 1);
  fdfRunWindowSchedule(
      aRing,
      [&](int32_t l) {
        const size_t o = size_t(l) * n;
        std::vector<uint8_t> aMaster(aOk);
        for (int j = 0; j < n && !theBad.empty(); ++j)
          aMaster[size_t(j)] = theBad[o + size_t(j)] ? 0 : 1;
        fdfCoherencePrepare(&thePair.mZ[o], aOk.data(), &thePair.mM[o], aMaster.data(), &thePair.mS[o], aOk.data(), n,
                            {}, aInvalid.data());
        fdfCoherenceTerms(&thePair.mZ[o], &thePair.mM[o], &thePair.mS[o], aInvalid.data(), n, aTerms.data(),
                          aRing.centre(l));
      },
      [&](int32_t l) { fdfCoherenceLine(aSums.data(), aRing.centre(l), n, -1.0f, &aOut[size_t(l) * n]); });
  return aOut;
}

// The coherence of pixel (l, j) summed directly over its Wr x Wa window of
// restored products and powers; theNull on the border or where the window
// holds a pixel marked in theBad.
double directCoherence(const SPair &thePair, const std::vector<uint8_t> &theBad, int theWr, int theWa, int l, int j,
                       double theNull) {
  const int P = thePair.mPixels;
  if (l < theWa / 2 || l >= thePair.mLines - theWa / 2 || j < theWr / 2 || j >= P - theWr / 2)
    return theNull;
  std::complex<double> aZ;
  double aM = 0, aS = 0;
  for (int k = l - theWa / 2; k < l - theWa / 2 + theWa; ++k)
    for (int c = j - theWr / 2; c < j - theWr / 2 + theWr; ++c) {
      const size_t i = size_t(k * P + c);
      if (!theBad.empty() && theBad[i])
        return theNull;
      aZ += std::complex<double>(thePair.mZ[i]) * std::sqrt(double(thePair.mM[i]) * thePair.mS[i]);
      aM += thePair.mM[i];
      aS += thePair.mS[i];
    }
  return std::min(std::abs(aZ) / std::sqrt(aM * aS), 0.999);
}

// Mean of the values at the centres of disjoint windows (computed pixels:
// ha .. L - ha - 1, hr .. P - hr - 1).
double disjointMean(const std::vector<float> &theValues, int theLines, int thePixels, int theWr, int theWa) {
  double aSum = 0;
  int aCount = 0;
  for (int l = theWa / 2; l < theLines - theWa / 2; l += theWa)
    for (int p = theWr / 2; p < thePixels - theWr / 2; p += theWr, ++aCount)
      aSum += theValues[size_t(l) * thePixels + p];
  return aSum / aCount;
}

class CoherenceStep : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }

  // The pair as rasters: NAME_int, NAME_mpwr and NAME_spwr (theUnits of the
  // power images; amplitudes are written as their square roots).
  std::string write(const std::string &theName, const SPair &thePair, const char *theUnits = "POWER") {
    STLRXTestRaster aZ, aM, aS;
    for (STLRXTestRaster *aRaster : {&aZ, &aM, &aS}) {
      aRaster->mLines = thePair.mLines;
      aRaster->mPixels = thePair.mPixels;
      aRaster->mDataUnits = theUnits;
      aRaster->mHasNull = true;
      aRaster->mNull = -9999;
    }
    aZ.mCellType = "FLOAT_COMPLEX";
    aZ.mDataUnits = "FLATTENED INTERFEROGRAMME";
    aZ.mCells = thePair.mZ;
    const bool aAmplitude = std::string(theUnits) == "AMPLITUDE";
    for (size_t i = 0; i < thePair.mM.size(); ++i) {
      aM.mValues.push_back(aAmplitude ? std::sqrt(thePair.mM[i]) : thePair.mM[i]);
      aS.mValues.push_back(aAmplitude ? std::sqrt(thePair.mS[i]) : thePair.mS[i]);
    }
    tlrxWriteTestRaster(mDir.file(theName + "_int"), aZ);
    tlrxWriteTestRaster(mDir.file(theName + "_mpwr"), aM);
    tlrxWriteTestRaster(mDir.file(theName + "_spwr"), aS);
    return mDir.file(theName);
  }

  // The step on NAME_int, NAME_mpwr, NAME_spwr into OUT with arguments 5 on.
  std::vector<double> run(const std::string &theName, const std::string &theOut, std::vector<std::string> theRest,
                          int (*theProgram)(int, char **) = tlrx_cc_ave) {
    std::vector<std::string> aArgs = {"tlrx_cc_ave", theName + "_int", theName + "_mpwr", theName + "_spwr",
                                      mDir.file(theOut)};
    aArgs.insert(aArgs.end(), theRest.begin(), theRest.end());
    EXPECT_EQ(tlrxCallStep(theProgram, aArgs), 0);
    return theProgram == tlrx_cc_ave ? tlrxReadTestRaster(mDir.file(theOut)) : std::vector<double>();
  }

  // Mean of the computed (not null) values.
  static double computedMean(const std::vector<double> &theValues) {
    double aSum = 0;
    int aCount = 0;
    for (double v : theValues)
      if (v != fdfGetDummyValue()) {
        aSum += v;
        ++aCount;
      }
    return aCount > 0 ? aSum / aCount : -1;
  }
};

} // namespace

// Touzi's expectation of the sample coherence on white single-look speckle:
// 5 x 5 windows give 0.607 for a true 0.6 and 0.178 for a true 0, 10 x 10
// windows 0.900 for a true 0.9 (disjoint windows, within 0.01).
TEST(CoherenceMeasure, SampleCoherenceFollowsTouzisExpectation) {
  const struct {
    double mTrue;
    int mWindow;
    double mExpected;
  } aCases[] = {{0.6, 5, 0.607}, {0.0, 5, 0.178}, {0.9, 10, 0.900}};
  for (const auto &aCase : aCases) {
    const SPair aPair = whitePair(500, 500, aCase.mTrue, 11);
    const std::vector<float> aG = ringCoherence(aPair, aCase.mWindow, aCase.mWindow);
    EXPECT_NEAR(disjointMean(aG, 500, 500, aCase.mWindow, aCase.mWindow), aCase.mExpected, 0.01) << aCase.mTrue;
  }
}

// The running sums against direct sums of the restored products on windows
// odd and even, with invalid pixels (each invalidates its windows); the
// border is null; one image with itself is 0.999 (never above 1); a phase
// alternating by pi cancels to 0 in an even window.
TEST(CoherenceMeasure, RunningSumsMatchDirectSumsAndTheEdgeRulesHold) {
  const int L = 23, P = 19;
  SPair aPair = whitePair(L, P, 0.5, 3);
  std::vector<uint8_t> aBad(size_t(L * P), 0);
  aBad[size_t(7 * P + 4)] = aBad[size_t(15 * P + 12)] = 1;
  for (const auto &aWindow : {std::pair<int, int>{5, 5}, {4, 3}, {2, 6}}) {
    const int Wr = aWindow.first, Wa = aWindow.second;
    const std::vector<float> aG = ringCoherence(aPair, Wr, Wa, aBad);
    // Computed columns run from hr to, not including, P - hr; lines likewise.
    for (int l = 0; l < L; ++l)
      for (int j = 0; j < P; ++j) {
        const double aWant = directCoherence(aPair, aBad, Wr, Wa, l, j, -1.0);
        if (aWant == -1.0)
          EXPECT_EQ(aG[size_t(l * P + j)], -1.0f) << Wr << "x" << Wa << " null " << l << "," << j;
        else
          EXPECT_NEAR(aG[size_t(l * P + j)], aWant, 2e-6) << Wr << "x" << Wa << " at " << l << "," << j;
      }
  }
  SPair aSame = whitePair(9, 12, 1.0, 5); // an image with itself: constant phase, equal powers
  std::fill(aSame.mZ.begin(), aSame.mZ.end(), TCell(0.6f, 0.8f));
  aSame.mS = aSame.mM;
  for (float v : ringCoherence(aSame, 5, 3))
    EXPECT_TRUE(v == -1.0f || v == CTLRX_COHERENCE_MAX) << v;
  std::fill(aSame.mM.begin(), aSame.mM.end(), 1.0f);
  aSame.mS = aSame.mM;
  for (size_t i = 0; i < aSame.mZ.size(); ++i)
    aSame.mZ[i] = TCell(i % 2 == 0 ? 1.0f : -1.0f, 0.0f); // pi from pixel to pixel
  for (float v : ringCoherence(aSame, 4, 3))
    EXPECT_TRUE(v == -1.0f || std::fabs(v) < 1e-6) << v;
}

// A fringe of 0.1 cycles per pixel in range under 10 x 10 windows at a true
// coherence of 0.9: the plain estimate falls to the bias floor; removing the
// local frequency (outer windows 15 x 15) or flattening by the true phase
// first brings it back to the expectation, 0.900.
TEST_F(CoherenceStep, LocalFrequencyRemovalAndFlatteningUndoAFringe) {
  const auto aFringe = [](int, int p) { return 2 * sPi * 0.1 * p; };
  const std::string aPair = write("f", whitePair(120, 120, 0.9, 21, aFringe));
  STLRXTestRaster aAux; // the auxiliary raster argument 9 names
  aAux.mValues.assign(20, 0.0);
  tlrxWriteTestRaster(mDir.file("aux"), aAux);
  EXPECT_LT(computedMean(run(aPair, "plain", {"10", "10"})), 0.15);
  ASSERT_TRUE(tlrxStartTrace());
  EXPECT_NEAR(computedMean(run(aPair, "local", {"10", "10", "15", "15", mDir.file("aux")})), 0.900, 0.02);
  EXPECT_NE(tlrxStopTrace(mDir.path()).find("Removel local frequency : 1\n"), std::string::npos);
  STLRXTestRaster aPhase;
  aPhase.mLines = aPhase.mPixels = 120;
  for (int l = 0; l < 120; ++l)
    for (int p = 0; p < 120; ++p)
      aPhase.mValues.push_back(aFringe(l, p));
  tlrxWriteTestRaster(mDir.file("sint"), aPhase);
  ASSERT_EQ(tlrxCallStep(tlrx_flattening, {"tlrx_flattening", aPair + "_int", mDir.file("sint"), mDir.file("flat")}), 0);
  ASSERT_EQ(std::rename((mDir.file("flat_dint")).c_str(), (aPair + "_int").c_str()), 0);
  ASSERT_EQ(std::rename((mDir.file("flat_dint.sml")).c_str(), (aPair + "_int.sml").c_str()), 0);
  EXPECT_NEAR(computedMean(run(aPair, "flat", {"10", "10"})), 0.900, 0.01);
}

// Amplitude power images give what power images give; the wide-swath switch
// uses the interferogram as it is (unit magnitudes: every computed pixel
// reflects the power sums through D only); local windows smaller than the
// coherence window are enlarged with the message; the processing window
// crops the inputs; the header names the "_slc" images.
TEST_F(CoherenceStep, SwitchesWindowsAndHeader) {
  const SPair aPair = whitePair(30, 40, 0.7, 5);
  const std::vector<double> aPower = run(write("p", aPair), "power", {"5"});
  const std::vector<double> aAmplitude = run(write("a", aPair, "AMPLITUDE"), "amplitude", {"5", "5"});
  for (size_t i = 0; i < aPower.size(); ++i)
    EXPECT_NEAR(aAmplitude[i], aPower[i], 1e-5) << i;
  tlrxExpectHeader(mDir.file("power"), "CellType=FLOAT;DataUnits=COHERENCE;NrOfLinesPerImage=30;NrOfPixelsPerLine=40;"
                                       "FilesList=" + mDir.file("p_slc") + "," + mDir.file("p_slc"));
  const std::vector<double> aCrop = run(mDir.file("p"), "crop", {"5", "5", "0", "0", "-", "10", "29", "4", "20"});
  tlrxExpectHeader(mDir.file("crop"), "NrOfLinesPerImage=17;NrOfPixelsPerLine=20");
  run(mDir.file("p"), "clamped", {"5", "5", "0", "0", "-", "10", "40", "4", "30"}); // limited to the image
  tlrxExpectHeader(mDir.file("clamped"), "NrOfLinesPerImage=26;NrOfPixelsPerLine=30");
  const std::vector<double> aWhole = tlrxReadTestRaster(mDir.file("power"));
  for (int l = 2; l < 15; ++l) // inside the crop's own border, the values of the whole image
    for (int p = 2; p < 18; ++p)
      EXPECT_NEAR(aCrop[size_t(l * 20 + p)], aWhole[size_t((l + 4) * 40 + p + 10)], 1e-6) << l << "," << p;
  STLRXTestRaster aAux;
  aAux.mValues.assign(20, 0.0);
  tlrxWriteTestRaster(mDir.file("aux"), aAux);
  // Either side smaller than the coherence window is enlarged.
  for (const char *aAzimuth : {"3", "7"}) {
    run(mDir.file("p"), "small", {"5", "5", "3", aAzimuth, mDir.file("aux")});
    EXPECT_NE(tlrxReadFile(mDir.file("Process.log"))
                  .find(std::string("\nInsert a Window Size to estimate the Local Frequency: Rg [3] Az [") + aAzimuth +
                        "] bigger than coherence window size: Rg [5] Az [5]"),
              std::string::npos);
  }
  // Wide swath: ORIGIN DATA of the master power; the magnitudes are not restored.
  const std::string aWide = write("w", aPair);
  CDescription aHeader;
  fdfReadStandardHeader((aWide + "_mpwr").c_str(), aHeader);
  fdfStampOtherInfo(aHeader, "ORIGIN DATA", "ENVISAT_WS_SR");
  ASSERT_TRUE(fdfWriteStandardHeader((aWide + "_mpwr").c_str(), aHeader));
  const std::vector<double> aWideG = run(aWide, "wide", {"5"});
  double aZr = 0, aZi = 0, aM = 0, aS = 0;
  for (int l = 0; l < 5; ++l)
    for (int p = 0; p < 5; ++p) {
      const size_t i = size_t(l * 40 + p);
      aZr += aPair.mZ[i].real();
      aZi += aPair.mZ[i].imag();
      aM += aPair.mM[i];
      aS += aPair.mS[i];
    }
  EXPECT_NEAR(aWideG[size_t(2 * 40 + 2)], std::hypot(aZr, aZi) / std::sqrt(aM * aS), 1e-6);
}

TEST_F(CoherenceStep, FailuresRaiseTheirCodesAndTheClosingRemovesTheInputs) {
  const std::string p = write("p", whitePair(12, 12, 0.5, 1));
  const std::string o = mDir.file("o");
  tlrxExpectStepFailures(
      tlrx_cc_ave, {
      {{p + "_int", p + "_mpwr", p + "_spwr"}, CTLRX_ERR_ARGUMENTS, ""},
      {{p + "_int", p + "_mpwr", p + "_spwr", o, "1"}, CTLRX_ERR_ARGUMENTS, ""},
      {{p + "_int", p + "_mpwr", p + "_spwr", o, "5", "1"}, CTLRX_ERR_ARGUMENTS, ""},
      {{p + "_int", p + "_mpwr", p + "_spwr", o, "5", "5", "7", "7"}, CTLRX_ERR_ARGUMENTS, ""},
      {{p + "_int", p + "_mpwr", p + "_spwr", o, "5", "5", "7", "7", mDir.file("none")}, CTLRX_ERR_FILE_OPEN,
       mDir.file("none") + "_hdr"},
      {{p + "_int", mDir.file("none"), p + "_spwr", o, "5"}, CTLRX_ERR_FILE_OPEN, mDir.file("none") + "_hdr"},
      {{p + "_int", p + "_mpwr", p + "_spwr", p + "_mpwr", "5"}, CTLRX_ERR_PARAMETER_FILE, p + "_mpwr"},
      {{p + "_int", p + "_mpwr", p + "_spwr", o, "5", "5", "0", "0", "-", "8", "3"}, CTLRX_ERR_ARGUMENTS,
       "processing window 8 3 0 11 of an image of 12 x 12"},
      },
      o);

  run(p, "o", {"5"}, tlrx_cc_ave_close);
  for (const char *aSuffix : {"_int", "_int.sml", "_mpwr", "_mpwr.sml", "_spwr", "_spwr.sml"})
    EXPECT_FALSE(tlrxFileExists(p + aSuffix)) << aSuffix;
}

// 1, 2 and 3 threads write the same bytes, both paths: an odd image of several
// bands with a last block cut short, windows of R odd and even, the whole
// image and a processing window off its corner. The plain path's values are
// those of direct sums, across block boundaries included.
TEST_F(CoherenceStep, ThreadsWriteTheSameBytesAsOneThread) {
  const SPair aPair = whitePair(557, 23, 0.6, 7, [](int l, int p) { return 0.3 * p + 0.1 * l; });
  const std::string aName = write("t", aPair);
  STLRXTestRaster aAux;
  aAux.mValues.assign(20, 0.0);
  tlrxWriteTestRaster(mDir.file("aux"), aAux);
  const std::vector<std::vector<std::string>> aCases = {
      {"5", "5"},
      {"3", "4"},
      {"5", "6", "0", "0", "-", "2", "20", "3", "550"},
      {"5", "5", "9", "9", mDir.file("aux")},
      {"3", "4", "7", "10", mDir.file("aux"), "1", "21", "5", "556"},
  };
  for (const auto &aCase : aCases) {
    std::string aWhat;
    for (const std::string &aToken : aCase)
      aWhat += aToken + " ";
    std::vector<double> aOne;
    std::string aBytes;
    for (const int aThreads : CTLRX_TEST_THREADS) {
      const CTestThreads aSetting(aThreads);
      const std::vector<double> aOut = run(aName, "t_cc", aCase);
      if (aThreads == 1) {
        aOne = aOut;
        aBytes = tlrxReadFile(mDir.file("t_cc"));
      } else {
        EXPECT_TRUE(tlrxReadFile(mDir.file("t_cc")) == aBytes) << aWhat << aThreads << " threads";
      }
    }
    if (aCase.size() != 2)
      continue;
    const int Wr = std::stoi(aCase[0]), Wa = std::stoi(aCase[1]);
    for (const int l : {0, 1, 2, 63, 64, 65, 66, 128, 129, 130, 195, 260, 554, 555, 556})
      for (const int j : {0, 2, 3, 11, 20, 21}) {
        const double aWant = directCoherence(aPair, {}, Wr, Wa, l, j, fdfGetDummyValue());
        EXPECT_NEAR(aOne[size_t(l * 23 + j)], aWant, 2e-6) << aWhat << "at " << l << "," << j;
      }
  }
}

// The host's interruption stops the step with its code whatever the threads,
// and no result is left.
TEST_F(CoherenceStep, InterruptionStopsTheStepWhateverTheThreads) {
  const std::string aName = write("i", whitePair(300, 9, 0.5, 3));
  for (const int aThreads : CTLRX_TEST_THREADS) {
    const CTestThreads aSetting(aThreads);
    for (const std::vector<std::string> &aArgs :
         {std::vector<std::string>{"5"}, std::vector<std::string>{"3", "3", "5", "5", aName + "_mpwr"}}) {
      tlrxWriteFile(mDir.file("Process.working"), "101\nhost\n");
      std::vector<std::string> aAll = {"tlrx_cc_ave", aName + "_int", aName + "_mpwr", aName + "_spwr",
                                       mDir.file("i_cc")};
      aAll.insert(aAll.end(), aArgs.begin(), aArgs.end());
      int32_t aCode = 0;
      try {
        tlrxCallStep(tlrx_cc_ave, aAll);
      } catch (const CErrorExceptionManager &aError) {
        aCode = aError.mCode;
      }
      EXPECT_EQ(aCode, CTLRX_ERR_INTERRUPTED) << aThreads << " threads, " << aArgs.size() << " arguments";
      EXPECT_FALSE(tlrxFileExists(mDir.file("i_cc"))) << aThreads;
    }
  }
  tlrxWriteFile(mDir.file("Process.working"), "0\nhost\n");
}
