// Temporal feature extraction over a dated series: orders the inputs in
// time, builds the common output grid, runs the per-pixel statistics line by
// line and writes one raster per requested feature (with optional GeoTIFF
// copies).
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "tlrx_temporal_statistics.h"

// One output per feature, in the order of ETemporalFeature: the parameter
// switch that requests it and the suffix appended to the output root.
struct STemporalOutput {
  const char *mSwitch; // field name in section "MAIN_CMD"
  const char *mSuffix;
  bool mDate;          // INT raster of days from the reference date
};
const STemporalOutput &fdfTemporalOutput(int theFeature);

// Key of the reference date in the date outputs' "RasterInfo.OtherInfo".
constexpr const char *CTLRX_TF_REFERENCE_KEY = "REFERENCE TIME OF MULTITEMPORAL : ";

struct STemporalRequest {
  std::string mParameterFile;       // read, never written
  std::vector<std::string> mInputs; // any order
  std::string mRoot;                // output root R
  std::string mInterpolation;       // kernel of geocoded inputs
  std::string mInterpolationText;   // "interp_type" as the parameter file gave it (logged)
  double mMaxIncrementThrDb = 1000.0;
  double mMaxDecrementThrTime = 1.0;
  bool mNormalize = false;
  bool mDecibels = false;
  bool mOutputs[CTLRX_TF_COUNT] = {};
  bool mMakeTiff = false;
  double mSaturation = 0.0;
};

// MaxRatioThr = 10^(dB / 10) and MaxRatioTimeThr = MaxRatioThr / days.
double fdfMaxRatioThreshold(double theMaxIncrementThrDb);
double fdfMaxRatioTimeThreshold(double theMaxIncrementThrDb, double theMaxDecrementThrTime);

// Runs the whole extraction; returns 0. Failures raise (see the unit).
int32_t fdfTemporalFeatureExtraction(const STemporalRequest &theRequest);
