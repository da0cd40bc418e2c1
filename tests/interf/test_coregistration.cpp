// The co-registration procedure on simulated SLC pairs with known shifts
// (tlrx_simulate slc), in throw mode: accuracy, robustness to decorrelated
// areas, the parameter file read back, and the edge cases and stage errors.
#include "tlrx_description_section.h"
#include "tlrx_description_test_support.h"
#include "tlrx_errors.h"
#include "tlrx_init_from_xml_schema.h"
#include "tlrx_interf_utility.h"
#include "tlrx_slc_test_support.h"
#include "tlrx_standard_header.h"
#include "tlrx_test_support.h"
#include "tlrx_trace_test_support.h"

#include <gtest/gtest.h>

#include <cmath>
#include <map>

namespace {

const std::map<std::string, std::string> sDefaults = {
    {"cc_start_shift_range", "0"}, {"cc_start_shift_azimuth", "0"}, {"cc_init_from_orbits_flag", "NotOK"},
    {"cc_init_from_amplitude_flag", "OK"}, {"cc_init_from_coherence_flag", "NotOK"}, {"cc_number_coeff_range", "3"},
    {"cc_number_coeff_azimuth", "3"}, {"cc_number_res_coeff_range", "1"}, {"cc_number_res_coeff_azimuth", "1"},
    {"cc_border_dinstance_range", "32"}, {"cc_border_dinstance_azimuth", "32"},
    {"cc_range_shift_dinst_multiple", "2"}, {"cc_azimuth_shift_dinst_multiple", "2"},
    {"cc_maximize_the_variance_flag", "NotOK"}, {"cc_variance_threshold", "0"}, {"cc_orbit_interpolation", "0"},
    {"input_shape_file_name", "NotOK"}, {"cc_activate_test_on_orbit_flag", "NotOK"},
    {"cc_range_win_size_test", "64"}, {"cc_azimuth_win_size_test", "64"}, {"cc_max_shift_test", "5"},
    {"cc_validity_threshold_test", "0.2"}, {"cc_init_range_win_size", "256"}, {"cc_init_azimuth_win_size", "256"},
    {"cc_init_range_position", "-1"}, {"cc_init_azimuth_position", "-1"}, {"cc_range_win_number_cc", "4"},
    {"cc_azimuth_win_number_cc", "4"}, {"cc_range_win_size_cc", "128"}, {"cc_azimuth_win_size_cc", "128"},
    {"cc_oversampling_cc", "8"}, {"cc_validity_threshold_cc", "0.2"}, {"cc_oversampling_fine", "16"},
    {"cc_range_win_number_fine", "12"}, {"cc_azimuth_win_number_fine", "12"}, {"cc_range_win_size_fine", "64"},
    {"cc_azimuth_win_size_fine", "64"}, {"cc_SNR_threshold", "20"}, {"cc_oversampling_coherence", "16"},
    {"cc_coh_reject_threshold", "0.3"}};

class Coregistration : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }

  std::string simulate(const std::string &theRoot, std::vector<std::string> theOptions) {
    return tlrxSimulateSlc(mDir, theRoot, std::move(theOptions));
  }

  // The command's parameter file: the defaults with theChanges ("" removes a key).
  std::string parameters(const std::map<std::string, std::string> &theChanges, CDescription &theOut) {
    std::map<std::string, std::string> aKeys = sDefaults;
    for (const auto &aChange : theChanges)
      aKeys[aChange.first] = aChange.second;
    std::string aXml = "<?xml version=\"1.0\" ?>\n<HEADER_INFO>\n<COREGISTRATION_CMD>\n";
    for (const auto &aKey : aKeys)
      if (!aKey.second.empty())
        aXml += "<" + aKey.first + ">" + aKey.second + "</" + aKey.first + ">\n";
    aXml += "</COREGISTRATION_CMD>\n<MAIN_CMD>\n<TellurixEnvironment>IDL_ENVI_ENV</TellurixEnvironment>\n"
            "</MAIN_CMD>\n</HEADER_INFO>\n";
    const std::string aFile = mDir.file("coherence.xml");
    tlrxWriteFile(aFile, aXml);
    EXPECT_TRUE(fdfInitParameters("PARAMETERS_INFO_MAIN_FE_COHERENCE_CMD",
                                  {"COREGISTRATION_CMD", "MAIN_CMD", "INTERF_CMD", "FLAT_CMD"}, aFile.c_str(), theOut));
    return aFile;
  }

  STLRXCoregResult run(const std::string &theRoot, const std::map<std::string, std::string> &theChanges,
                       STLRXCoregSwitches theSwitches = {}) {
    CDescription aParameters;
    theSwitches.mCommandFile = parameters(theChanges, aParameters);
    return fdfCoregistration((theRoot + "_1").c_str(), (theRoot + "_2").c_str(), (theRoot + "_par").c_str(),
                             aParameters, 1, 1, theSwitches);
  }

  std::string log() const { return tlrxReadFile(mDir.file("Process.log")); }
};

// Largest difference between two polynomials over the image (a 9 x 9 grid
// including the corners; the difference of polynomials of degree 2 peaks there).
double maxDifference(const std::vector<double> &theA, const std::vector<double> &theB, int theLines, int thePixels) {
  double aMax = 0;
  for (int i = 0; i <= 8; ++i)
    for (int j = 0; j <= 8; ++j) {
      const double x = (thePixels - 1) * i / 8.0, y = (theLines - 1) * j / 8.0;
      aMax = std::max(aMax, std::fabs(fdfCoregPolyValue(theA, x, y) - fdfCoregPolyValue(theB, x, y)));
    }
  return aMax;
}

} // namespace

// 2048 x 2048 at coherence 0.8 with an affine field that moves by 0.8 pixel
// across the image: the fit lies within 0.01 pixel of the truth everywhere,
// the inverse undoes it, the single windows spread within twice the bound,
// and the parameter file holds what was found.
TEST_F(Coregistration, AffineFieldIsFoundWithinAHundredthOfAPixel) {
  const std::vector<double> aRange = {0.3, 4e-4, -2e-4}, aAzimuth = {-0.7, 2e-4, 4e-4};
  const std::string aRoot = simulate("affine", {"--lines", "2048", "--pixels", "2048", "--coherence", "0.8",
                                                "--shift-field", "0.3,4e-4,-2e-4,-0.7,2e-4,4e-4", "--seed", "3"});
  const STLRXCoregResult aResult = run(aRoot, {{"cc_range_win_number_fine", "20"}, {"cc_azimuth_win_number_fine", "20"}});
  EXPECT_LT(maxDifference(aResult.mRangePoly, aRange, 2048, 2048), 0.01);
  EXPECT_LT(maxDifference(aResult.mAzimuthPoly, aAzimuth, 2048, 2048), 0.01);
  EXPECT_EQ(aResult.mFineWindows, 400);
  EXPECT_LT(aResult.mRejected + aResult.mOutliers, 8);
  // Only the lines of the window bands were read: 20 bands of 64 lines per image, and the central and coarse ones.
  EXPECT_LT(aResult.mLinesRead, 2 * (20 * 64 + 4 * 128 + 256) + 200);
  double aSquares = 0;
  int aCount = 0;
  for (const STLRXCoregPoint &aPoint : aResult.mFinePoints) {
    // Inverse: master - slave at the slave position.
    const double aXs = aPoint.mPixel + aPoint.mRangeShift, aYs = aPoint.mLine + aPoint.mAzimuthShift;
    EXPECT_NEAR(fdfCoregPolyValue(aResult.mRangePolyInv, aXs, aYs), -fdfCoregPolyValue(aRange, aPoint.mPixel, aPoint.mLine), 0.01);
    EXPECT_NEAR(fdfCoregPolyValue(aResult.mAzimuthPolyInv, aXs, aYs), -fdfCoregPolyValue(aAzimuth, aPoint.mPixel, aPoint.mLine), 0.01);
    for (const double aError : {aPoint.mRangeShift - fdfCoregPolyValue(aRange, aPoint.mPixel, aPoint.mLine),
                                aPoint.mAzimuthShift - fdfCoregPolyValue(aAzimuth, aPoint.mPixel, aPoint.mLine)}) {
      aSquares += aError * aError;
      ++aCount;
    }
  }
  const double g = 0.8, aSamples = 64 * 64 / 1.44;
  const double aBound = std::sqrt(3 / (10 * aSamples)) * std::sqrt(2 + 5 * g * g - 7 * g * g * g * g) / (M_PI * g * g);
  EXPECT_LT(std::sqrt(aSquares / aCount), 2 * std::hypot(aBound, 1 / (16 * std::sqrt(12.0))));

  CDescription aFile;
  fdfReadStandardHeader((aRoot + "_par").c_str(), aFile);
  const CDescriptionField &aPoly = aFile.getField("interferometric_processing.DRangePoly");
  ASSERT_EQ(aPoly.getColNbr(), 3);
  for (int32_t k = 0; k < 3; ++k) {
    EXPECT_NEAR(aPoly.getDouble(k), aResult.mRangePoly[size_t(k)], 1e-12);
    EXPECT_NEAR(aFile.getField("interferometric_processing.DAzimuthPolyInv").getDouble(k), aResult.mAzimuthPolyInv[size_t(k)], 1e-12);
  }
  EXPECT_EQ(aFile.getField("interferometric_processing.DRangePolyResTopo").getColNbr(), 1);
  EXPECT_EQ(aFile.getField("interferometric_processing.DAzimuthPolyResTopo").getDouble(0), 0.0);
  EXPECT_EQ(aFile.getField("RasterInfo.NrOfLinesPerImage").getInteger(), 2048);
}

// Constant shifts found from the start shifts or from the central window,
// within half a step of the fine oversampling; no shift gives almost none.
TEST_F(Coregistration, ConstantShiftsFromStartShiftsOrCentralWindow) {
  const std::string aMoved = simulate("moved", {"--lines", "640", "--pixels", "640", "--shift", "12.4,-7.8"});
  const std::string aStill = simulate("still", {"--lines", "640", "--pixels", "640"});
  const struct {
    const std::string &mRoot;
    const char *mAmplitude, *mStartRange, *mStartAzimuth;
    double mRange, mAzimuth, mTolerance;
  } aCases[] = {{aMoved, "NotOK", "12", "-8", 12.4, -7.8, 1.0 / 32},
                {aMoved, "OK", "0", "0", 12.4, -7.8, 1.0 / 32},
                {aStill, "OK", "0", "0", 0.0, 0.0, 0.005}};
  for (const auto &aCase : aCases) {
    SCOPED_TRACE(aCase.mRoot + " amplitude " + aCase.mAmplitude);
    const STLRXCoregResult aResult =
        run(aCase.mRoot, {{"cc_init_from_amplitude_flag", aCase.mAmplitude}, {"cc_start_shift_range", aCase.mStartRange},
                          {"cc_start_shift_azimuth", aCase.mStartAzimuth}, {"cc_number_coeff_range", "1"},
                          {"cc_number_coeff_azimuth", "1"}, {"cc_range_win_number_fine", "8"},
                          {"cc_azimuth_win_number_fine", "8"}});
    ASSERT_EQ(aResult.mRangePoly.size(), 1u);
    EXPECT_NEAR(aResult.mRangePoly[0], aCase.mRange, aCase.mTolerance);
    EXPECT_NEAR(aResult.mAzimuthPoly[0], aCase.mAzimuth, aCase.mTolerance);
  }
}

// 10 % of the scene decorrelated: its windows are rejected and the
// polynomials move by less than 0.005 pixel.
TEST_F(Coregistration, DecorrelatedAreaIsRejectedAndMovesThePolynomialsByLessThanAHalfHundredth) {
  const std::vector<std::string> aScene = {"--lines", "1024", "--pixels", "1024", "--shift-field",
                                           "0.2,2e-4,1e-4,-0.4,-1e-4,3e-4", "--seed", "9"};
  std::vector<std::string> aDecorrelated = aScene;
  aDecorrelated.insert(aDecorrelated.end(), {"--coherence-box", "300,300,320,328,0"});
  // The central window would fall into the decorrelated area: start shifts.
  const std::map<std::string, std::string> aStart = {{"cc_init_from_amplitude_flag", "NotOK"}};
  const STLRXCoregResult aClean = run(simulate("clean", aScene), aStart);
  const STLRXCoregResult aBad = run(simulate("bad", aDecorrelated), aStart);
  EXPECT_LT(maxDifference(aClean.mRangePoly, aBad.mRangePoly, 1024, 1024), 0.005);
  EXPECT_LT(maxDifference(aClean.mAzimuthPoly, aBad.mAzimuthPoly, 1024, 1024), 0.005);
  int aInside = 0;
  for (const STLRXCoregPoint &aPoint : aBad.mFinePoints)
    if (aPoint.mLine - 32 >= 300 && aPoint.mLine + 32 < 620 && aPoint.mPixel - 32 >= 300 && aPoint.mPixel + 32 < 628) {
      ++aInside;
      EXPECT_FALSE(aPoint.mUsed) << aPoint.mPixel << "," << aPoint.mLine << " snr " << aPoint.mSnr;
    }
  EXPECT_GE(aInside, 9);
  EXPECT_GE(aBad.mRejected + aBad.mOutliers, aInside);
}

// A master of 500 lines asks for at most a plane; the absent rejection
// threshold is logged; the coherence-based fine stage finds the same shift;
// inhibited kinds are traced and the orbits are logged as unavailable.
TEST_F(Coregistration, SmallImageLowersThePolynomialAndCoherenceStageAgrees) {
  const std::string aRoot = simulate("small", {"--lines", "500", "--pixels", "2000", "--shift", "0.35,-0.6"});
  ASSERT_TRUE(tlrxStartTrace());
  STLRXCoregSwitches aSwitches;
  aSwitches.mAllowOrbits = false;
  const STLRXCoregResult aResult =
      run(aRoot, {{"cc_number_coeff_azimuth", "6"}, {"cc_coh_reject_threshold", ""}, {"cc_init_from_orbits_flag", "OK"},
                  {"cc_init_from_coherence_flag", "OK"}, {"cc_azimuth_win_number_fine", "6"}},
          aSwitches);
  const std::string aTrace = tlrxStopTrace(mDir.path());
  EXPECT_EQ(aResult.mAzimuthPoly.size(), 3u);
  // A constant shift keeps the bias of the 1/16 step.
  EXPECT_LT(maxDifference(aResult.mRangePoly, {0.35}, 500, 2000), 1.0 / 32);
  EXPECT_LT(maxDifference(aResult.mAzimuthPoly, {-0.6}, 500, 2000), 1.0 / 32);
  const std::string aLog = log();
  EXPECT_NE(aLog.find("\n*******Image too small for using a second order polynomial (min size is : 600): decrease Az "
                      "Poly automatically to linear ********\n"),
            std::string::npos);
  EXPECT_EQ(aLog.find("decrease Rg Poly"), std::string::npos); // range asked for 3 already
  EXPECT_NE(aLog.find("\ncc_coh_reject_threshold not initialized"), std::string::npos);
  EXPECT_NE(aLog.find("\ncc_range_shift_dint_multiple: [2.000000]"), std::string::npos);
  EXPECT_NE(aLog.find("\ncc_init_from_coherence_flag: [TRUE]"), std::string::npos);
  EXPECT_NE(aLog.find("Fine estimation (coherence)"), std::string::npos);
  EXPECT_NE(aTrace.find("\n INIBITE cc_init_from_orbits_flag"), std::string::npos);
  EXPECT_EQ(aTrace.find("INIBITE cc_init_from_amplitude_flag"), std::string::npos);
  EXPECT_NE(aTrace.find(" aNrRow =500\n aNrCol =2000\n"), std::string::npos);
}

// Same name, missing header and every failing stage, with their codes and
// the stage's message in the log.
TEST_F(Coregistration, FailuresRaiseTheirCodes) {
  const std::string aRoot = simulate("pair", {"--lines", "640", "--pixels", "640"});
  CDescription aParameters;
  const std::string aCommand = parameters({}, aParameters);
  STLRXCoregSwitches aSwitches;
  aSwitches.mCommandFile = aCommand;
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { fdfCoregistration((aRoot + "_1").c_str(), (aRoot + "_2").c_str(), aCommand.c_str(),
                                               aParameters, 1, 1, aSwitches); }, &aMessage),
            CTLRX_ERR_PARAMETER_FILE);
  EXPECT_EQ(aMessage, aCommand);
  EXPECT_NE(log().find("\nError used the same name for input output parameter File : [" + aCommand + "]"),
            std::string::npos);
  EXPECT_EQ(tlrxCodeOf([&] { fdfCoregistration((aRoot + "_1").c_str(), (aRoot + "_2").c_str(), (aRoot + "_1.sml").c_str(),
                                               aParameters, 1, 1, aSwitches); }),
            CTLRX_ERR_PARAMETER_FILE);
  EXPECT_EQ(tlrxCodeOf([&] { fdfCoregistration((aRoot + "_1").c_str(), mDir.file("none").c_str(),
                                               (aRoot + "_par").c_str(), aParameters, 1, 1, aSwitches); }, &aMessage),
            CTLRX_ERR_FILE_OPEN);
  EXPECT_EQ(aMessage, mDir.file("none") + "_hdr");
  EXPECT_EQ(tlrxCodeOf([&] { run(aRoot, {{"cc_SNR_threshold", ""}}); }, &aMessage), CTLRX_ERR_DS_FIELD_MISSING);
  EXPECT_EQ(aMessage, "COREGISTRATION_CMD.cc_SNR_threshold");
  const struct {
    std::map<std::string, std::string> mChanges;
    int32_t mCode;
    const char *mLog;
  } aStages[] = {
      {{{"cc_range_win_size_fine", "1000"}}, CTLRX_ERR_COREG_INIT, "\nError occour during initialization of class Cross-Corr"},
      {{{"cc_validity_threshold_cc", "1.5"}}, CTLRX_ERR_COREG_CENTRAL, "\nError occour during initialization of Central window"},
      {{{"cc_validity_threshold_cc", "1.5"}, {"cc_init_from_amplitude_flag", "NotOK"}}, CTLRX_ERR_COREG_COARSE,
       "\nError occour during first shift estimation form amplitude of class Cross-Corr"},
      {{{"cc_SNR_threshold", "1e9"}}, CTLRX_ERR_COREG_FINE, "\nError occour during fine shift estimation of class Cross-Corr"},
  };
  for (const auto &aStage : aStages) {
    SCOPED_TRACE(aStage.mLog);
    EXPECT_EQ(tlrxCodeOf([&] { run(aRoot, aStage.mChanges); }, &aMessage), aStage.mCode);
    EXPECT_NE(aMessage.find("Master : [" + aRoot + "_1]\n\t\t and Slave : [" + aRoot + "_2]"), std::string::npos);
    EXPECT_NE(log().find(aStage.mLog), std::string::npos);
  }
}
