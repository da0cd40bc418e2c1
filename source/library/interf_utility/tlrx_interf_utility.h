// Co-registration of a single-look complex pair: the range and azimuth shifts
// of the slave over the master grid as polynomials of the master position,
// estimated from the parameters of section "COREGISTRATION_CMD" in stages
// (initial shift, coarse grid, fine grid, least-squares fit) and written to
// the co-registration parameter file that the interferogram generator reads.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

class CDescription;

// The caller's fixed switches: which initialisation kinds it allows (a
// disallowed kind is traced "\n INIBITE <flag>" and switched off), and the
// command's own parameter file, which the procedure never writes over.
struct STLRXCoregSwitches {
  bool mAllowOrbits = true;
  bool mAllowAmplitude = true;
  bool mAllowCoherence = true;
  std::string mCommandFile;
};

// Polynomial form, read the same way by the interferogram generator: terms
// 1, x, y, x^2, x y, y^2 (as many as there are coefficients) in 0-based master
// pixel coordinates, x the pixel and y the line.
double fdfCoregPolyValue(const std::vector<double> &theCoeffs, double thePixel, double theLine);

// Least-squares fit of range and azimuth shifts measured at master positions,
// on coordinates normalised to [-1, 1] over theWidth x theHeight (only inside
// the fit; the coefficients returned are in pixels), with iterative data
// snooping: the point of largest |w| = |e| / (s0 sqrt(q_ii)) over both fits
// is dropped while above 3.29 and while at least three times the unknowns
// would remain. False when fewer points than unknowns or a singular system.
struct STLRXShiftFit {
  std::vector<double> mRange;
  std::vector<double> mAzimuth;
  std::vector<uint8_t> mUsed;
  double mRmsRange = 0.0;
  double mRmsAzimuth = 0.0;
  int32_t mOutliers = 0;
};
constexpr double CTLRX_COREG_SNOOPING_CRITICAL = 3.29;
bool fdfFitShiftPolynomials(const std::vector<double> &thePixels, const std::vector<double> &theLines,
                            const std::vector<double> &theRange, const std::vector<double> &theAzimuth,
                            int32_t theRangeCoeffs, int32_t theAzimuthCoeffs, double theWidth, double theHeight,
                            STLRXShiftFit &theFit);

// One window of the fine grid that gave a shift.
struct STLRXCoregPoint {
  double mPixel = 0.0; // master window centre
  double mLine = 0.0;
  double mRangeShift = 0.0; // slave - master
  double mAzimuthShift = 0.0;
  double mCorrelation = 0.0;
  double mSnr = 0.0;
  bool mAccepted = false; // passed the stage's threshold
  bool mUsed = false;     // kept by the fit
};

struct STLRXCoregResult {
  std::vector<double> mRangePoly;
  std::vector<double> mAzimuthPoly;
  std::vector<double> mRangePolyInv; // master - slave, polynomial of slave coordinates
  std::vector<double> mAzimuthPolyInv;
  double mInitialRange = 0.0;
  double mInitialAzimuth = 0.0;
  std::vector<STLRXCoregPoint> mFinePoints;
  int32_t mFineWindows = 0; // placed on the fine grid
  int32_t mRejected = 0;    // failed or below the stage's threshold
  int32_t mOutliers = 0;    // dropped by the data snooping
  double mRmsRange = 0.0;
  double mRmsAzimuth = 0.0;
  int64_t mLinesRead = 0;   // master and slave lines read from the files
};

// The whole procedure: master and slave SLC rasters, the co-registration
// parameter file to write, the command's parameters, the looks, the caller's
// switches. Writes "interferometric_processing.DRangePoly", "DAzimuthPoly",
// their "ResTopo" (zeros: no elevation model here) and "Inv" forms into the
// parameter file (the master's header plus these fields) and returns what
// it found. Failures raise: 456960 same name, 261122 missing header, 848642
// missing parameter, 652810 to 652813 the failing stage.
STLRXCoregResult fdfCoregistration(const char *theMaster, const char *theSlave, const char *theParameterFile,
                                   const CDescription &theParameters, int32_t theRangeLooks,
                                   int32_t theAzimuthLooks, const STLRXCoregSwitches &theSwitches);
