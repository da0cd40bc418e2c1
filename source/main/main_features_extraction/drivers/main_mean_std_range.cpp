// Driver of the temporal feature extraction: reads the parameter file
// through the shared protocol, applies the defaults, logs every setting and
// hands the request to the feature worker.
#include "main_mean_std_range.h"

#include "tlrx_description_section.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"
#include "tlrx_header_numbers.h"
#include "tlrx_init_from_xml_schema.h"
#include "tlrx_resampling_kernels.h"
#include "tlrx_temporal_features.h"

#include <algorithm>
#include <exception>
#include <string>

namespace {

constexpr const char *CTLRX_TF_SCHEMA = "PARAMETERS_INFO_MT_FEAT_EXT_CMD";
constexpr const char *CTLRX_TF_SECTION = "MAIN_CMD";
constexpr const char *CTLRX_TF_TITLE = "Multitemporal Feature Extraction";
constexpr int CTLRX_TF_STARS = 160;
constexpr double CTLRX_TF_DEFAULT_INCREMENT_DB = 1000.0;
constexpr double CTLRX_TF_DEFAULT_DECREMENT_DAYS = 1.0;

std::string fdfKey(const char *theField) { return std::string(CTLRX_TF_SECTION) + "." + theField; }

const CDescriptionField *fdfSetting(const CDescription &theParameters, const char *theField) {
  const CDescriptionField *aField = theParameters.findField(fdfKey(theField).c_str());
  return aField != nullptr && aField->holdsValue() ? aField : nullptr;
}

bool fdfSwitch(const CDescription &theParameters, const char *theField) {
  const CDescriptionField *aField = fdfSetting(theParameters, theField);
  return aField != nullptr && fdfIsSwitchOn(aField->getString());
}

// A threshold that is absent or not positive takes its default.
double fdfPositive(const CDescription &theParameters, const char *theField, double theDefault) {
  const double aValue = fdfHeaderRealOr(theParameters, fdfKey(theField).c_str(), theDefault);
  return aValue > 0.0 ? aValue : theDefault;
}

const char *fdfShown(bool theOn) { return theOn ? "TRUE" : "FALSE"; }

std::vector<std::string> fdfInputList(const CDescription &theParameters) {
  std::vector<std::string> aNames;
  const CDescriptionField *aList = fdfSetting(theParameters, "input_file_list");
  const int32_t aCount = aList != nullptr ? aList->getNumberOfElements() : 0;
  for (int32_t i = 0; i < aCount; ++i)
    aNames.push_back(aList->isSet(i) ? aList->getString(i) : "");
  return aNames;
}

STemporalRequest fdfReadRequest(const CDescription &theParameters, const char *theFile) {
  STemporalRequest aRequest;
  aRequest.mInputs = fdfInputList(theParameters);
  if (aRequest.mInputs.empty()) {
    fdfLogMessage("\nNeed at  least an input file: [%s]", theFile);
    fdfTraceMessage("Need at  least an input file: ");
    TLRX_RAISE(CTLRX_ERR_PARAMETER_FILE, theFile);
  }
  aRequest.mParameterFile = theFile;
  aRequest.mRoot = theParameters.getFieldWithValue(fdfKey("out_root_file_name").c_str()).getString();
  // An empty root would scatter "_mea" and the rest over the current folder.
  if (aRequest.mRoot.empty()) {
    fdfLogMessage("\nEmpty out_root_file_name: [%s]", theFile);
    TLRX_RAISE(CTLRX_ERR_PARAMETER_FILE, fdfKey("out_root_file_name").c_str());
  }
  const CDescriptionField *aInterpolation = fdfSetting(theParameters, "interp_type");
  aRequest.mInterpolationText = aInterpolation != nullptr ? aInterpolation->getString() : "";
  bool aKnown = false;
  aRequest.mInterpolation = fdfKernelName(fdfKernelFromName(aRequest.mInterpolationText.c_str(), aKnown));
  aRequest.mMaxIncrementThrDb = fdfPositive(theParameters, "max_increment_thr_db", CTLRX_TF_DEFAULT_INCREMENT_DB);
  aRequest.mMaxDecrementThrTime =
      fdfPositive(theParameters, "max_decrement_thr_time", CTLRX_TF_DEFAULT_DECREMENT_DAYS);
  aRequest.mNormalize = fdfSwitch(theParameters, "normalize");
  aRequest.mDecibels = fdfSwitch(theParameters, "out_db");
  for (int f = 0; f < CTLRX_TF_COUNT; ++f)
    aRequest.mOutputs[f] = fdfSwitch(theParameters, fdfTemporalOutput(f).mSwitch);
  // A run that writes nothing is no success a host could rely on.
  if (std::none_of(aRequest.mOutputs, aRequest.mOutputs + CTLRX_TF_COUNT, [](bool theOn) { return theOn; })) {
    fdfLogMessage("\nNo output is switched on: [%s]", theFile);
    TLRX_RAISE(CTLRX_ERR_PARAMETER_FILE, "MAIN_CMD: no output switch (mean ... date_min_before_max) is OK");
  }
  aRequest.mMakeTiff = fdfSwitch(theParameters, "make_tiff");
  // A setting without a default, logged whether or not GeoTIFF copies are made.
  aRequest.mSaturation = fdfHeaderReal(theParameters, fdfKey("saturation_default").c_str());
  return aRequest;
}

void fdfLogRequest(const STemporalRequest &theRequest) {
  fdfLogMessage("\n\n Input Slave List\n ");
  for (const std::string &aName : theRequest.mInputs)
    fdfLogMessage("%s\n", aName.c_str());
  fdfLogMessage("\nout_root_file_name: [%s]", theRequest.mRoot.c_str());
  fdfLogMessage("\ninterp_type: [%s]", theRequest.mInterpolationText.c_str());
  fdfLogMessage("\nmax_increment_thr_db: [%lf]", theRequest.mMaxIncrementThrDb);
  fdfLogMessage("\nmax_decrement_thr_time: [%lf]", theRequest.mMaxDecrementThrTime);
  fdfLogMessage("\nnormalize: [%s]", fdfShown(theRequest.mNormalize));
  fdfLogMessage("\nOut Db: [%s]", fdfShown(theRequest.mDecibels));
  for (int f = 0; f < CTLRX_TF_COUNT; ++f)
    fdfLogMessage("\n%s: [%s]", fdfTemporalOutput(f).mSwitch, fdfShown(theRequest.mOutputs[f]));
  fdfLogMessage("\nmake_tiff: [%s]", fdfShown(theRequest.mMakeTiff));
  fdfLogMessage("\nsaturation_default: [%lf]", theRequest.mSaturation);
}

int32_t fdfRunTemporal(const char *theArguments) {
  const char *aFile = theArguments != nullptr ? theArguments : "";
  CDescription aParameters;
  fdfLoadCommandParameters(CTLRX_TF_SCHEMA, {CTLRX_TF_SECTION}, aFile, aParameters);
  fdfStartProcess(nullptr, 0, CTLRX_TF_TITLE, "\nMAIN PARAMETERS\n\n");
  fdfLogMessage("%s\n", std::string(CTLRX_TF_STARS, '*').c_str());
  const STemporalRequest aRequest = fdfReadRequest(aParameters, aFile);
  fdfLogRequest(aRequest);
  return fdfTemporalFeatureExtraction(aRequest);
}

} // namespace

int32_t main_mean_std_range(const char *theArguments) {
  try {
    return fdfRunTemporal(theArguments);
  } catch (const CErrorExceptionManager &) {
    throw;
  } catch (const std::exception &aException) {
    fdfTraceMessage("Exception raised: %s\n", aException.what());
    TLRX_RAISE(CTLRX_ERR_UNEXPECTED, aException.what());
  } catch (...) {
    TLRX_RAISE(CTLRX_ERR_UNEXPECTED, fdfGetProcessName());
  }
}
