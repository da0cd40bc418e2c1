// The interferogram generator on simulated SLC pairs (tlrx_simulate slc), in
// throw mode: what it computes against the truth of the simulation, the looks
// and block rules, the result headers and the updated parameter file, the
// optional outputs, and its failures with their codes.
#include "tlrx_description_section.h"
#include "tlrx_description_test_support.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_header_expect.h"
#include "tlrx_hires_interf_SLC_with_sint.h"
#include "tlrx_raster_file.h"
#include "tlrx_slc_test_support.h"
#include "tlrx_standard_header.h"
#include "tlrx_test_support.h"
#include "tlrx_trace_test_support.h"

#include <gtest/gtest.h>

#include <cmath>
#include <complex>
#include <functional>
#include <numeric>
#include <sstream>

namespace {

using TCell = std::complex<float>;
constexpr double sPi = 3.14159265358979323846;

using SImage = STLRXTestSlc;

// Coherence of the multilooked product over a whole image, with a phase
// model removed: |sum z sqrt(Pm Ps) e^(-i phase)| / sqrt(sum Pm sum Ps).
double globalCoherence(const SImage &theInterferogram, const std::vector<double> &theMaster,
                       const std::vector<double> &theSlave, const std::function<double(int, int)> &thePhase,
                       int theBorder = 8) {
  std::complex<double> aSum;
  double aMaster = 0, aSlave = 0;
  for (int l = theBorder; l < theInterferogram.mLines - theBorder; ++l)
    for (int p = theBorder; p < theInterferogram.mPixels - theBorder; ++p) {
      const size_t i = static_cast<size_t>(l) * theInterferogram.mPixels + p;
      aSum += std::complex<double>(theInterferogram.mCells[i]) * std::sqrt(theMaster[i] * theSlave[i]) *
              std::polar(1.0, -thePhase(l, p));
      aMaster += theMaster[i];
      aSlave += theSlave[i];
    }
  return std::abs(aSum) / std::sqrt(aMaster * aSlave);
}

class Interferogram : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }

  std::string simulate(const std::string &theRoot, std::vector<std::string> theOptions) {
    return tlrxSimulateSlc(mDir, theRoot, std::move(theOptions));
  }

  // The co-registration parameter file theName: the master's header with
  // constant shifts in polynomials of theTerms terms and their inverse
  // (theInverse false leaves the inverse out).
  std::string parameters(const std::string &theMaster, double theRange, double theAzimuth, int theTerms = 3,
                         bool theInverse = true, const std::string &theName = "pair_par") {
    CDescription aParameters;
    fdfReadStandardHeader(theMaster.c_str(), aParameters);
    const auto aSet = [&](const char *theKey, double theShift) {
      CDescriptionField &aField = aParameters.getField((std::string("interferometric_processing.") + theKey).c_str());
      aField.setNumberOfElements(theTerms);
      for (int32_t i = 0; i < theTerms; ++i)
        aField.setDouble(i, i == 0 ? theShift : 0.0);
    };
    aSet("DRangePoly", theRange);
    aSet("DAzimuthPoly", theAzimuth);
    if (theInverse) {
      aSet("DRangePolyInv", -theRange);
      aSet("DAzimuthPolyInv", -theAzimuth);
    }
    EXPECT_TRUE(fdfWriteStandardHeader(mDir.file(theName).c_str(), aParameters));
    return mDir.file(theName);
  }

  // Runs the generator on ROOT_1 and ROOT_2 (or theSlave) into OUT_mpwr,
  // OUT_spwr, OUT_int with arguments 7 onwards.
  void run(const std::string &theRoot, const std::string &theOut, std::vector<std::string> theRest,
           const std::string &theSlave = "") {
    std::vector<std::string> aArgs = {"tlrx_hires_interf_SLC_with_sint", theRoot + "_1",
                                      theSlave.empty() ? theRoot + "_2" : theSlave, mDir.file("pair_par"),
                                      mDir.file(theOut + "_mpwr"), mDir.file(theOut + "_spwr"),
                                      mDir.file(theOut + "_int")};
    aArgs.insert(aArgs.end(), theRest.begin(), theRest.end());
    EXPECT_EQ(tlrxCallStep(tlrx_hires_interf_SLC_with_sint, aArgs), 0);
  }

  // Coherence of OUT's product with the phase model removed.
  double coherence(const std::string &theOut, const std::function<double(int, int)> &thePhase) {
    return globalCoherence(tlrxReadSlc(mDir.file(theOut + "_int")), tlrxReadTestRaster(mDir.file(theOut + "_mpwr")),
                           tlrxReadTestRaster(mDir.file(theOut + "_spwr")), thePhase);
  }

  std::string log() const { return tlrxReadFile(mDir.file("Process.log")); }

  // A NUMBER raster theName of theLines x thePixels cells theValue(l, p).
  std::string numberRaster(const char *theName, int theLines, int thePixels,
                           const std::function<double(int, int)> &theValue) {
    STLRXTestRaster aTest;
    aTest.mLines = theLines;
    aTest.mPixels = thePixels;
    aTest.mDataUnits = "NUMBER";
    for (int l = 0; l < theLines; ++l)
      for (int p = 0; p < thePixels; ++p)
        aTest.mValues.push_back(theValue(l, p));
    tlrxWriteTestRaster(mDir.file(theName), aTest);
    return mDir.file(theName);
  }
};

// Rewrites the header of theRaster after theEdit.
void editHeader(const std::string &theRaster, const std::function<void(CDescription &)> &theEdit) {
  CDescription aHeader;
  fdfReadStandardHeader(theRaster.c_str(), aHeader);
  theEdit(aHeader);
  ASSERT_TRUE(fdfWriteStandardHeader(theRaster.c_str(), aHeader));
}

const auto sNoPhase = [](int, int) { return 0.0; };

} // namespace

// An image with itself: phase 0 and magnitude 1 in every look; cells that
// are no data in the master (0 + 0i) give exactly 0 + 0i and power 0; the
// powers are the multilook means, equal for master and slave.
TEST_F(Interferogram, ImageWithItselfGivesUnitMagnitudeAndZeroPhase) {
  // 61 lines: the last group of fringe-estimate lines is a short one.
  const std::string aRoot = simulate("same", {"--lines", "61", "--pixels", "48"});
  parameters(aRoot + "_1", 0, 0);
  {
    CRasterFile aRaster; // a no-data square in the master
    aRaster.open_read_write((aRoot + "_1").c_str());
    std::vector<TCell> aLine(48);
    for (int l = 20; l < 30; ++l) {
      aRaster.getComplexLine(aLine.data(), l);
      std::fill(aLine.begin() + 10, aLine.begin() + 20, TCell());
      aRaster.putComplexLine(l, aLine.data());
    }
    aRaster.close();
  }
  for (const int aRangeLooks : {1, 2}) {
    SCOPED_TRACE(aRangeLooks);
    run(aRoot, "s", {std::to_string(aRangeLooks), "1", "NotOK"}, aRoot + "_1"); // the master as its own slave
    const SImage aZ = tlrxReadSlc(mDir.file("s_int"));
    const std::vector<double> aMaster = tlrxReadTestRaster(mDir.file("s_mpwr")),
                              aSlavePower = tlrxReadTestRaster(mDir.file("s_spwr"));
    ASSERT_EQ(aZ.mPixels, 48 / aRangeLooks);
    int aZeros = 0;
    for (int l = 0; l < aZ.mLines; ++l)
      for (int p = 0; p < aZ.mPixels; ++p) {
        const size_t i = static_cast<size_t>(l) * aZ.mPixels + p;
        EXPECT_EQ(aMaster[i], aSlavePower[i]);
        if (aMaster[i] == 0.0) {
          EXPECT_EQ(aZ.mCells[i], TCell()) << l << "," << p;
          ++aZeros;
          continue;
        }
        EXPECT_NEAR(std::abs(aZ.mCells[i]), 1.0, 1e-5) << l << "," << p;
        EXPECT_NEAR(std::arg(aZ.mCells[i]), 0.0, 1e-5);
      }
    EXPECT_EQ(aZeros, 10 * 10 / aRangeLooks) << "the no-data square, and only it, is 0";
  }
}

// A sub-pixel shift in both axes at full coherence is undone by the
// resampling and a known phase ramp is recovered, compared as arg(z
// conj(ramp)); the ramp was put on the slave's own grid, so it is seen at the
// slave positions. Every magnitude is at most 1. Without the shift the pair
// decorrelates.
TEST_F(Interferogram, ShiftIsUndoneAndPhaseRampRecovered) {
  const std::string aRoot = simulate("shift", {"--lines", "160", "--pixels", "160", "--coherence", "1", "--shift",
                                               "0.37,-0.61", "--phase-ramp", "0.005,0.01", "--seed", "5"});
  parameters(aRoot + "_1", 0.37, -0.61);
  run(aRoot, "out", {"1", "1", "NotOK"});
  const auto aRamp = [](int l, int p) { return 2 * sPi * (0.005 * (l - 0.61) + 0.01 * (p + 0.37)); };
  EXPECT_GE(coherence("out", aRamp), 0.998);
  const SImage aZ = tlrxReadSlc(mDir.file("out_int"));
  std::complex<double> aResidual;
  for (int l = 8; l < aZ.mLines - 8; ++l)
    for (int p = 8; p < aZ.mPixels - 8; ++p) {
      EXPECT_LE(std::abs(aZ.at(l, p)), 1.0F);
      // The look of 2 oversampled samples sits a quarter pixel on.
      aResidual += std::complex<double>(aZ.at(l, p)) * std::polar(1.0, -aRamp(l, p) - 2 * sPi * 0.01 * 0.25);
    }
  EXPECT_NEAR(std::arg(aResidual), 0.0, 0.005);
  parameters(aRoot + "_1", 0, 0);
  run(aRoot, "unshifted", {"1", "1", "NotOK"});
  EXPECT_LT(coherence("unshifted", aRamp), 0.9);
}

// Azimuth spectra of both images centred at 0.3 of the PRF: the centroid
// (from the header, or estimated from the data when the header has none) is
// removed before the azimuth interpolation and the pair keeps its coherence.
TEST_F(Interferogram, DopplerCentroidIsRemovedBeforeInterpolating) {
  const std::string aRoot = simulate("doppler", {"--lines", "160", "--pixels", "128", "--coherence", "1", "--shift",
                                                 "0.2,0.5", "--doppler", "0.3,0.3", "--seed", "7"});
  parameters(aRoot + "_1", 0.2, 0.5);
  run(aRoot, "header", {"1", "1", "NotOK"});
  EXPECT_GE(coherence("header", sNoPhase), 0.99);
  EXPECT_NE(log().find("slave Doppler centroid from the header: 0.3"), std::string::npos);
  for (const char *aImage : {"_1", "_2"})
    editHeader(aRoot + aImage, [](CDescription &theHeader) { theHeader.getField("ChannelInfo.DopplerCentroidCoeff").clear(); });
  run(aRoot, "data", {"1", "1", "NotOK"});
  EXPECT_GE(coherence("data", sNoPhase), 0.99);
  const std::string aLog = log(), aKey = "slave Doppler centroid estimated from the data: ";
  ASSERT_NE(aLog.find(aKey), std::string::npos);
  EXPECT_NEAR(std::atof(aLog.c_str() + aLog.find(aKey) + aKey.size()), 0.3, 0.01);
}

// Geometric decorrelation: bands moved by 20 % of the range bandwidth give a
// coherence of about 0.8; the spectral-shift filter brings it to 0.97 or more.
// Centroids 0.15 of the PRF apart: about 1 - 0.15 x 1.2, and the Doppler filter
// brings it to 0.97 or more. Range looks -2 keep the oversampled samples
// apart, so a fringe is not averaged over a look.
TEST_F(Interferogram, CommonBandFiltersRecoverTheCoherence) {
  const std::string aRoot =
      simulate("band", {"--lines", "192", "--pixels", "192", "--coherence", "1", "--range-band-shift", "0.2"});
  parameters(aRoot + "_1", 0, 0);
  const auto aRamp = [](int, int p) { return 2 * sPi * (0.2 / 1.2) * p / 2; }; // cycles per oversampled sample
  run(aRoot, "plain", {"-2", "1", "NotOK", "-", "NotOK", "NotOK"});
  EXPECT_NEAR(coherence("plain", aRamp), 0.8, 0.03);
  run(aRoot, "filtered", {"-2", "1", "NotOK", "-", "OK", "NotOK"});
  EXPECT_GE(coherence("filtered", aRamp), 0.97);
  EXPECT_NE(log().find("mean spectral shift: 0.166"), std::string::npos);
  // A master header without the range bandwidth skips the filter, saying so.
  editHeader(aRoot + "_1", [](CDescription &theHeader) { theHeader.getField("ChannelInfo.RangeBandwidth").clear(); });
  run(aRoot, "skipped", {"-2", "1", "NotOK", "-", "OK", "NotOK"});
  EXPECT_EQ(tlrxReadFile(mDir.file("skipped_int")), tlrxReadFile(mDir.file("plain_int")));
  EXPECT_NE(log().find("\nSpectral shift filter skipped: " + aRoot + "_1 has no RangeBandwidth or RangeSamplingRate\n"),
            std::string::npos);

  const std::string aDoppler =
      simulate("dop", {"--lines", "192", "--pixels", "128", "--coherence", "1", "--doppler", "0.1,-0.05"});
  parameters(aDoppler + "_1", 0, 0);
  run(aDoppler, "dplain", {"1", "1", "NotOK", "-", "NotOK", "NotOK"});
  run(aDoppler, "dfiltered", {"1", "1", "NotOK", "-", "NotOK", "OK"});
  EXPECT_NEAR(coherence("dplain", sNoPhase), 1 - 0.15 * 1.2, 0.03);
  EXPECT_GE(coherence("dfiltered", sNoPhase), 0.97);
}

// Range looks 0 and -1 behave as 1; -2 oversamples by 2 without range
// multilook; the azimuth looks sum whole groups of lines. The headers carry
// the looks and spacings, the counts and the pair's names and times.
TEST_F(Interferogram, LooksRulesAndResultHeaders) {
  const std::string aRoot = simulate("looks", {"--lines", "53", "--pixels", "40", "--coherence", "0.7"});
  parameters(aRoot + "_1", 0, 0);
  run(aRoot, "one", {"1", "5", "NotOK"});
  for (const char *aLooks : {"0", "-1"}) {
    run(aRoot, "same", {aLooks, "5", "NotOK"});
    EXPECT_EQ(tlrxReadFile(mDir.file("same_int")), tlrxReadFile(mDir.file("one_int"))) << aLooks;
  }
  run(aRoot, "over", {"-2", "5", "NotOK"});
  ASSERT_TRUE(tlrxStartTrace());
  run(aRoot, "three", {"3", "2", "NotOK"});
  const std::string aTrace = tlrxStopTrace(mDir.path());
  for (const char *aLine :
       {"*** interferogram from SLC SAR images - SINC interp.+spectral shift + doppler filter + topographic shift "
        "v6.0 apr-08 ***\n",
        "\n\n*** aSyntPhaseName :NotOK", "\n\n*** aApplySpecs :FALSE", "\n\n*** aApplyDopFil :FALSE",
        "Interpolation buffers size Master: [5000]\n", "Interpolation buffers overlap Master: [50]\n",
        "\n\n*** aTopoShift (if false use the polinome) :FALSE", "\n------ Read: parameter file with polinomes",
        "Image size Master = col[40] x row[53]\n", "number of interferometric looks (range,azimuth): 3, 2\n",
        "\n\nNormalization factor :0.0833333", "writing new parameters to parameter file"})
    EXPECT_NE(aTrace.find(aLine), std::string::npos) << aLine;
  const struct {
    const char *mOut;
    int mLines, mPixels, mRangeLooks, mAzimuthLooks;
    double mSpacingRg, mSpacingAz;
  } aCases[] = {{"one", 10, 40, 1, 5, 7.9, 4.0 * 5}, {"over", 10, 80, 1, 5, 7.9 / 2, 4.0 * 5},
                {"three", 26, 13, 3, 2, 7.9 * 3, 4.0 * 2}};
  const auto aNumber = [](double theValue) {
    char aText[32];
    std::snprintf(aText, sizeof aText, "%.17g", theValue);
    return std::string(aText);
  };
  for (const auto &aCase : aCases)
    for (const auto &aResult : {std::make_pair("_int", "FLOAT_COMPLEX;DataUnits=INTERFEROGRAMME"),
                                {"_mpwr", "FLOAT;DataUnits=POWER"}, {"_spwr", "FLOAT;DataUnits=POWER"}}) {
      const std::string aName = mDir.file(aCase.mOut) + aResult.first;
      tlrxExpectHeader(aName, std::string("CellType=") + aResult.second +
                                  ";NrOfLinesPerImage=" + std::to_string(aCase.mLines) +
                                  ";NrOfPixelsPerLine=" + std::to_string(aCase.mPixels) +
                                  ";HeaderOffset=0;RowPrefix=0;RowSuffix=0;NullCellValue=0;FilesList=" + aRoot + "_1," +
                                  aRoot + "_2;Processing.NRangeLooks=" + std::to_string(aCase.mRangeLooks) +
                                  ";NAzimuthLooks=" + std::to_string(aCase.mAzimuthLooks) +
                                  ";PixelSpacingRg=" + aNumber(aCase.mSpacingRg) +
                                  ";PixelSpacingAz=" + aNumber(aCase.mSpacingAz) +
                                  ";interferometric_processing.ProcessedPixels=" +
                                  std::to_string(aCase.mLines * aCase.mPixels));
      for (const char *aKey : {"ACQUISITION TIME", "MASTER ACQUISITION TIME", "SLAVE ACQUISITION TIME"})
        EXPECT_EQ(tlrxOtherInfo(aName, aKey), tlrxOtherInfo(aRoot + (aKey[0] == 'S' ? "_2" : "_1"), "ACQUISITION TIME"))
            << aName << " " << aKey;
    }
  // The powers are multilook means: the mean over the image is kept.
  const auto aMean = [&](const char *theName) {
    const std::vector<double> aValues = tlrxReadTestRaster(mDir.file(theName));
    return std::accumulate(aValues.begin(), aValues.end(), 0.0) / aValues.size();
  };
  EXPECT_NEAR(aMean("three_mpwr") / aMean("one_mpwr"), 1.0, 0.05);
  CDescription aParameters;
  fdfReadStandardHeader(mDir.file("pair_par").c_str(), aParameters);
  EXPECT_EQ(aParameters.getField("interferometric_processing.ProcessedPixels").getInteger(), 26 * 13);
  // Second-order polynomials on an image this small draw the advice.
  const std::string aAdvice = "In case of images with dimension smaller than [600]. Is suggest the usage of a linear "
                              "co-registration polynomial instead a second order degree\n";
  EXPECT_EQ(log().find(aAdvice), std::string::npos);
  parameters(aRoot + "_1", 0, 0, 6);
  run(aRoot, "six", {"1", "5", "NotOK"});
  EXPECT_NE(log().find(aAdvice), std::string::npos);
}

// Blocks of 5000 and of 250 lines give the same bytes, filters off and on;
// the default byte order of the setting is the results' "BytesOrder".
TEST_F(Interferogram, BlockSizeDoesNotChangeTheResult) {
  const std::string aRoot = simulate("block", {"--lines", "600", "--pixels", "64", "--coherence", "0.8", "--shift",
                                               "0.3,0.4", "--doppler", "0.05,-0.05", "--range-band-shift", "0.1"});
  parameters(aRoot + "_1", 0.3, 0.4);
  for (const char *aFilter : {"NotOK", "OK"}) {
    SCOPED_TRACE(aFilter);
    run(aRoot, "big", {"1", "5", "NotOK", "-", aFilter, aFilter, "5000", "50"});
    run(aRoot, "small", {"1", "5", "NotOK", "-", aFilter, aFilter, "250", "50"});
    for (const char *aSuffix : {"_int", "_mpwr", "_spwr"})
      EXPECT_EQ(tlrxReadFile(mDir.file(std::string("big") + aSuffix)),
                tlrxReadFile(mDir.file(std::string("small") + aSuffix)));
  }
  fdfSetEnvVar("MSBF", "TELLURIX_DEFAULT_BYTE_ORDER");
  run(aRoot, "msbf", {"1", "5", "NotOK", "-", "OK", "OK", "250", "50"});
  CDescription aHeader;
  fdfReadStandardHeader(mDir.file("msbf_int").c_str(), aHeader);
  EXPECT_STREQ(aHeader.getField("RasterInfo.BytesOrder").getString(), "MSBF");
  EXPECT_EQ(tlrxReadSlc(mDir.file("msbf_int")).mCells, tlrxReadSlc(mDir.file("small_int")).mCells);
}

// Any thread count gives the bytes of one: 203 lines are several bands with a
// last block cut short, for azimuth looks 1 and 3, filters off and on, a
// synthetic phase, the co-registered pair, and the parameters written back.
// A field whose shifts reach too far mid-image fails as with one thread.
TEST_F(Interferogram, ThreadCountDoesNotChangeTheResult) {
  const int aLines = 203, aPixels = 53;
  const std::string aRoot = simulate("thr", {"--lines", "203", "--pixels", "53", "--coherence", "0.8", "--shift",
                                             "0.3,-0.45", "--doppler", "0.05,-0.05", "--range-band-shift", "0.1"});
  const std::string aSint = numberRaster("sint", aLines, aPixels, [](int l, int p) { return 0.3 * p - 0.02 * l; });
  // Arguments 7 on, and the result's pixels: 53 x 2 oversampled, in groups
  // of 2 x range looks (1 for -2).
  const struct {
    std::vector<std::string> mArgs;
    int mOutPixels;
  } aCases[] = {
      {{"1", "1", "NotOK", "-", "NotOK", "NotOK"}, 53},
      {{"1", "3", "NotOK", "-", "OK", "OK"}, 53},
      {{"2", "1", aSint, "-", "OK", "NotOK"}, 26},
      {{"-2", "3", "NotOK", "-", "OK", "OK", "100", "10", "NotOK", "NotOK", "NotOK", "NotOK", "-", "NotOK", "OK"}, 106},
  };
  for (const auto &aTable : aCases) {
    const std::vector<std::string> &aCase = aTable.mArgs;
    SCOPED_TRACE(aCase[0] + " " + aCase[1] + " " + aCase[2] + " " + aCase[4]);
    std::vector<std::string> aFirst;
    for (const int aThreads : CTLRX_TEST_THREADS) {
      const CTestThreads aSetting(aThreads);
      parameters(aRoot + "_1", 0.3, -0.45);
      run(aRoot, "t", aCase);
      std::vector<std::string> aBytes;
      for (const char *aFile : {"t_int", "t_mpwr", "t_spwr", "pair_par.sml", "thr_1_rsp", "thr_2_rsp"})
        aBytes.push_back(tlrxFileExists(mDir.file(aFile)) ? tlrxReadFile(mDir.file(aFile)) : "");
      if (aThreads == 1)
        aFirst = aBytes;
      for (size_t i = 0; i < aBytes.size(); ++i)
        EXPECT_TRUE(aBytes[i] == aFirst[i]) << aThreads << " threads, file " << i;
    }
    EXPECT_EQ(aFirst[0].size(), size_t(aLines / std::stoi(aCase[1])) * aTable.mOutPixels * 8);
    EXPECT_EQ(aFirst[4].empty(), aCase.size() < 15);
  }
  // Azimuth shifts 0.0017 x y lines at pixel x: master line y reaches over
  // floor(0.0017 x 52 y) + 8 slave lines, more than 20 from the line below.
  const std::string aPar = parameters(aRoot + "_1", 0, 0, 6);
  editHeader(aPar, [](CDescription &theHeader) {
    theHeader.getField("interferometric_processing.DAzimuthPoly").setDouble(4, 0.0017);
  });
  int aLine = 0;
  while (std::floor(0.0017 * 52 * aLine) + 8 <= 20)
    ++aLine;
  const std::string aWant = "the azimuth shifts of master line " + std::to_string(aLine) +
                            " reach over 21 slave lines, more than the 20 lines a block holds";
  for (const int aThreads : CTLRX_TEST_THREADS) {
    SCOPED_TRACE(aThreads);
    const CTestThreads aSetting(aThreads);
    std::string aMessage;
    EXPECT_EQ(tlrxCodeOf(
                  [&] {
                    tlrxCallStep(tlrx_hires_interf_SLC_with_sint,
                                 {"step", aRoot + "_1", aRoot + "_2", aPar, mDir.file("w_mpwr"), mDir.file("w_spwr"),
                                  mDir.file("w_int"), "1", "1", "NotOK", "-", "OK", "OK", "20"});
                  },
                  &aMessage),
              CTLRX_ERR_ARGUMENTS);
    EXPECT_EQ(aMessage, aWant);
    EXPECT_FALSE(tlrxFileExists(mDir.file("w_int")));
  }
}

// Positions 20 and 21: the kernel table beside the interferogram, and the
// co-registered pair named folder + input name + "_rsp" (the master as read,
// the slave on the master grid).
TEST_F(Interferogram, KernelFileAndCoregisteredPair) {
  // SHORT_COMPLEX cells (amplitudes about 100) are read as well.
  const std::string aRoot = simulate(
      "rsp", {"--lines", "40", "--pixels", "32", "--shift", "1,0", "--cell-type", "SHORT_COMPLEX", "--reflectivity", "1e4"});
  parameters(aRoot + "_1", 1, 0);
  run(aRoot, "out", {"1", "1", "NotOK", "-", "NotOK", "NotOK", "100", "10", "NotOK", "NotOK", "NotOK", "NotOK",
                     "-", "OK", "OK"});
  const std::vector<std::string> aKernel = tlrxReadLines(mDir.file("interf_interpolator.dat"));
  ASSERT_FALSE(aKernel.empty());
  double aSum = 0, aValue = 0;
  std::istringstream aRow(aKernel[aKernel.size() / 2]);
  aRow >> aValue; // the fraction
  EXPECT_NEAR(aValue, 0.5, 1e-6);
  while (aRow >> aValue)
    aSum += aValue;
  EXPECT_NEAR(aSum, 1.0, 1e-5) << "every row has unit sum";
  const SImage aMaster = tlrxReadSlc(aRoot + "_1"), aMasterRsp = tlrxReadSlc(mDir.file("rsp_1_rsp"));
  EXPECT_EQ(aMaster.mCells, aMasterRsp.mCells);
  const SImage aSlave = tlrxReadSlc(aRoot + "_2"), aSlaveRsp = tlrxReadSlc(mDir.file("rsp_2_rsp"));
  // A whole-pixel shift: master pixel p is slave pixel p + 1, up to the kernel's rounding.
  for (int l = 0; l < 40; ++l)
    for (int p = 4; p < 27; ++p)
      EXPECT_LT(std::abs(aSlaveRsp.at(l, p) - aSlave.at(l, p + 1)), 1e-4 * (1 + std::abs(aSlave.at(l, p + 1))));
}

// Shift rasters (both given) stand for the polynomials: the same shifts give
// the same bytes. A synthetic phase on the master grid is removed (phase 0
// left) and gives the spectral shift; local incidence rasters are accepted
// and logged as not used.
TEST_F(Interferogram, ShiftRastersSyntheticPhaseAndIncidence) {
  // Lines long enough that the oversampling's edge ringing (the lines are not
  // periodic) stays in the border left out.
  const int n = 48, aPixels = 128;
  // The fringe is put on the slave after its move and moves its spectrum by
  // 0.05: a whole-pixel range shift keeps the range pass exact.
  const std::string aRoot = simulate("opt", {"--lines", "48", "--pixels", "128", "--coherence", "1", "--shift",
                                             "1,-0.5", "--phase-ramp", "0,0.05"});
  parameters(aRoot + "_1", 1, -0.5);
  const auto aRaster = [&](const char *theName, const std::function<double(int, int)> &theValue) {
    return numberRaster(theName, n, aPixels, theValue);
  };
  const std::string aRange = aRaster("shr", [](int, int) { return 1.0; }),
                    aAzimuth = aRaster("sha", [](int, int) { return -0.5; });
  // The ramp was put on the slave's grid: seen at the slave column p + 1.
  const std::string aPhase = aRaster("sint", [](int, int p) { return 2 * sPi * 0.05 * (p + 1); });
  const std::string aIncidence = aRaster("inc", [](int, int) { return 23.0; });
  run(aRoot, "poly", {"1", "1", "NotOK"});
  run(aRoot, "rasters", {"1", "1", "NotOK", "-", "NotOK", "NotOK", "5000", "50", "NotOK", "NotOK", aRange, aAzimuth});
  EXPECT_EQ(tlrxReadFile(mDir.file("rasters_int")), tlrxReadFile(mDir.file("poly_int")));
  // One shift raster alone does not stand for the polynomials.
  const std::string aWrong = aRaster("shw", [](int, int) { return 0.0; });
  run(aRoot, "alone", {"1", "1", "NotOK", "-", "NotOK", "NotOK", "5000", "50", "NotOK", "NotOK", aWrong, "NotOK"});
  EXPECT_EQ(tlrxReadFile(mDir.file("alone_int")), tlrxReadFile(mDir.file("poly_int")));
  run(aRoot, "flat", {"-2", "1", aPhase, "-", "NotOK", "NotOK", "5000", "50", aIncidence, aIncidence});
  const SImage aZ = tlrxReadSlc(mDir.file("flat_int"));
  // Single-look phases are noisy where the speckle is dark: lines are compared.
  for (int l = 8; l < n - 8; ++l) {
    std::complex<double> aSum;
    for (int p = 32; p < 2 * aPixels - 32; ++p)
      aSum += std::complex<double>(aZ.at(l, p));
    EXPECT_NEAR(std::arg(aSum), 0.0, 0.01) << l;
  }
  run(aRoot, "specs", {"1", "1", aPhase, "-", "OK", "NotOK"});
  const std::string aLog = log();
  EXPECT_NE(aLog.find("\n\nFIND SPECTRAL SHIFT VALUE FROM SYTHETIC PHASE :" + aPhase), std::string::npos);
  EXPECT_NE(aLog.find("mean spectral shift: 0.05 cycles per pixel"), std::string::npos);
  EXPECT_NE(aLog.find("local incidence raster " + aIncidence + " accepted and not used"), std::string::npos);
}

// Every failure with its code, message and log line; nothing is left that
// looks like a result.
TEST_F(Interferogram, FailuresRaiseTheirCodes) {
  const std::string aRoot = simulate("bad", {"--lines", "32", "--pixels", "32"});
  // A SHORT_COMPLEX master passes the cell-type check; a FLOAT slave does not.
  const std::string aFloat = simulate("float", {"--lines", "32", "--pixels", "32", "--cell-type", "SHORT_COMPLEX"});
  editHeader(aFloat + "_2", [](CDescription &theHeader) { theHeader.getField("RasterInfo.CellType").setString("FLOAT"); });
  const std::string aPar = parameters(aRoot + "_1", 0, 0), aNoInverse = parameters(aRoot + "_1", 0, 0, 3, false, "noinv"),
                    aSeven = parameters(aRoot + "_1", 0, 0, 7, true, "seven"), aWide = parameters(aRoot + "_1", 0, 0, 3, true, "wide");
  // Azimuth shifts growing by 2 lines a pixel: one master line reaches over the whole slave.
  editHeader(aWide, [](CDescription &theHeader) { theHeader.getField("interferometric_processing.DAzimuthPoly").setDouble(1, 2.0); });
  const std::string m = aRoot + "_1", s = aRoot + "_2", o = mDir.file("o");
  const struct {
    std::vector<std::string> mArgs;
    int32_t mCode;
    std::string mMessage;
    const char *mLog;
  } aCases[] = {
      {{m, s, aPar, o + "m", o + "s", o + "i", "1", "1"}, CTLRX_ERR_ARGUMENTS, "", nullptr},
      {{m, mDir.file("none"), aPar, o + "m", o + "s", o + "i", "1", "1", "NotOK"}, CTLRX_ERR_FILE_OPEN,
       mDir.file("none") + "_hdr", nullptr},
      {{aFloat + "_1", aFloat + "_2", aPar, o + "m", o + "s", o + "i", "1", "1", "NotOK"},
       CTLRX_ERR_IMAGES_INCOMPATIBLE, "FLOAT (input file 2: " + aFloat + "_2)",
       "Error: unsupported data type: FLOAT for input file 2\n"},
      {{m, s, aNoInverse, o + "m", o + "s", o + "i", "1", "1", "NotOK"}, CTLRX_ERR_DS_FIELD_MISSING,
       "DRangePolyInv, or DAzimuthPolyInv in " + aNoInverse,
       "Error: missing parameter field DRangePolyInv, or DAzimuthPolyInv"},
      {{m, s, aSeven, o + "m", o + "s", o + "i", "1", "1", "NotOK"}, CTLRX_ERR_DS_TYPE,
       "interferometric_processing.DRangePoly: 7 terms in " + aSeven, nullptr},
      {{m, s, aWide, o + "m", o + "s", o + "i", "1", "1", "NotOK", "-", "NotOK", "NotOK", "20"}, CTLRX_ERR_ARGUMENTS,
       "the azimuth shifts of master line 0 reach over 38 slave lines, more than the 20 lines a block holds", nullptr},
      {{m, s, aPar, o + "m", o + "s", s, "1", "1", "NotOK"}, CTLRX_ERR_PARAMETER_FILE, s, nullptr},
      {{m, s, aPar, o + "m", mDir.path() + "./om", o + "i", "1", "1", "NotOK"}, CTLRX_ERR_PARAMETER_FILE,
       mDir.path() + "./om", nullptr}, // one result spelled two ways
      {{m, m, aPar, o + "m", o + "s", o + "i", "1", "1", "NotOK", "-", "NotOK", "NotOK", "100", "10", "NotOK", "NotOK",
        "NotOK", "NotOK", "-", "NotOK", "OK"}, // both co-registered images would be bad_1_rsp
       CTLRX_ERR_PARAMETER_FILE, mDir.file("bad_1_rsp"), nullptr},
      {{m, s, aPar, o + "m", o + "s", o + "i", "1", "0", "NotOK"}, CTLRX_ERR_ARGUMENTS,
       "azimuth looks 0, block size 5000, overlap 50", nullptr},
      {{m, s, aPar, o + "m", o + "s", o + "i", "40", "1", "NotOK"}, CTLRX_ERR_OUTPUT_SIZE, m + ": 32 x 32", nullptr},
  };
  for (const auto &aCase : aCases) {
    std::vector<std::string> aArgs = aCase.mArgs;
    aArgs.insert(aArgs.begin(), "tlrx_hires_interf_SLC_with_sint");
    SCOPED_TRACE(aArgs.size() > 6 ? aArgs[6] + " " + aArgs[7] : "");
    std::string aMessage;
    EXPECT_EQ(tlrxCodeOf([&] { tlrxCallStep(tlrx_hires_interf_SLC_with_sint, aArgs); }, &aMessage),
              aCase.mCode);
    if (!aCase.mMessage.empty())
      EXPECT_EQ(aMessage, aCase.mMessage);
    if (aCase.mLog != nullptr)
      EXPECT_NE(log().find(aCase.mLog), std::string::npos);
    for (const char *aResult : {"m", "s", "i"})
      EXPECT_FALSE(tlrxFileExists(o + aResult)) << aResult;
  }
}
