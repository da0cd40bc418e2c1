// Coherence driver: reads the parameter file, logs every setting under its
// heading, derives the names of the chain, estimates the co-registration
// when asked, and runs the plan of step programs through the step runner.
#include "main_coherence.h"

#include "tlrx_cc_ave.h"
#include "tlrx_description_section.h"
#include "tlrx_description_xml.h"
#include "tlrx_driver_guard.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_flattening.h"
#include "tlrx_fringe_filter.h"
#include "tlrx_generic_utility.h"
#include "tlrx_hires_interf_SLC_with_sint.h"
#include "tlrx_init_from_xml_schema.h"
#include "tlrx_interf_utility.h"
#include "tlrx_platform.h"
#include "tlrx_raster_to_geotiff.h"
#include "tlrx_result_files.h"
#include "tlrx_step_common.h"
#include "tlrx_step_runner.h"
#include "tlrx_synt_phase.h"

#include <cctype>
#include <cstdio>
#include <map>
#include <string>

namespace {

constexpr const char *CTLRX_CC_SCHEMA = "PARAMETERS_INFO_MAIN_FE_COHERENCE_CMD";
constexpr const char *CTLRX_CC_TITLE = "Coherence Generation";
constexpr int CTLRX_CC_STARS = 160;
const char *const CTLRX_CC_NOT_OK = "NotOK";

// The orbit and phase-slope programs need orbit data this system does not
// hold; the plan of this command never names them.
int fdfOrbitStepUnavailable(int, char **) {
  fdfTraceMessage("Error: %s needs orbit data, which this program does not handle\n", fdfGetProcessName());
  TLRX_RAISE_F(CTLRX_ERR_PARAMETER_FILE, "%.200s: no orbit data", fdfGetProcessName());
}

enum ECoherenceStep { CTLRX_CC_INTERFEROGRAM = 0, CTLRX_CC_COHERENCE = 1, CTLRX_CC_FILTER = 2, CTLRX_CC_TIFF = 3,
                      CTLRX_CC_ORBIT_FIRST = 6, CTLRX_CC_ORBIT_SECOND = 7, CTLRX_CC_PHASE_SLOPE = 8,
                      CTLRX_CC_SYNTHETIC = 9, CTLRX_CC_FLATTENING = 10 };

const std::vector<STLRXStep> sCoherenceSteps = {
    {"SLC interferogramme generation", tlrx_hires_interf_SLC_with_sint, fdfStepNothingToClose},
    {"coherence generation", tlrx_cc_ave, tlrx_cc_ave_close},
    {"Boxcar filter", tlrx_fringe_filter, fdfStepNothingToClose},
    {"Coherence to tiff conversion", make_tiff, fdfStepNothingToClose},
    {"Power Master to tiff conversion", make_tiff, fdfStepNothingToClose},
    {"Power Slave to tiff conversion", make_tiff, fdfStepNothingToClose},
    {"Orbit estimation", fdfOrbitStepUnavailable, fdfStepNothingToClose},
    {"Orbit estimation", fdfOrbitStepUnavailable, fdfStepNothingToClose},
    {"Phase slope", fdfOrbitStepUnavailable, fdfStepNothingToClose},
    {"Split Synt Phase Generation", tlrx_split_synt_phase, tlrx_split_synt_phase_close},
    {"Flattening phase calculation", tlrx_flattening, tlrx_flattening_close},
};

// How a key is read: flags are "OK" or "NotOK" from here on, numbers keep
// the text of their format, strings are passed on as they are.
enum ECoherenceKind { CTLRX_CC_FLAG, CTLRX_CC_FLAG_ON_WHEN_ABSENT, CTLRX_CC_FLAG_WHEN_SET, CTLRX_CC_INTEGER,
                      CTLRX_CC_REAL, CTLRX_CC_TEXT };

struct SCoherenceKey {
  const char *mKey;
  ECoherenceKind mKind;
  const char *mHeading; // logged before the key when not nullptr
};

const char *const sInterfHeading = "\n\n\n\nINTERFEROMETRIC PARAMETERS\n\n";
const char *const sFlatHeading = "\n\n\n\nFLATTENING PARAMETERS\n\n";
const char *const sMainHeading = "\n\n\n\nMAIN PARAMETERS\n\n";

const SCoherenceKey sCoherenceKeys[] = {
    {"INTERF_CMD.int_spectral_shift_filter_flag", CTLRX_CC_FLAG_ON_WHEN_ABSENT, sInterfHeading},
    {"INTERF_CMD.int_doppler_filter_flag", CTLRX_CC_FLAG, nullptr},
    {"INTERF_CMD.int_blocksize", CTLRX_CC_INTEGER, nullptr},
    {"INTERF_CMD.int_block_overlap", CTLRX_CC_INTEGER, nullptr},
    {"FLAT_CMD.in_dem_file_name", CTLRX_CC_TEXT, sFlatHeading},
    {"FLAT_CMD.in_gcp_file_name", CTLRX_CC_TEXT, nullptr},
    {"FLAT_CMD.synt_phase_interp_box_size", CTLRX_CC_INTEGER, nullptr},
    {"FLAT_CMD.synt_phase_mean_box_size", CTLRX_CC_INTEGER, nullptr},
    {"FLAT_CMD.synt_phase_orbit_interp_val", CTLRX_CC_INTEGER, nullptr},
    {"FLAT_CMD.synt_resamp_grid_size", CTLRX_CC_REAL, nullptr},
    {"FLAT_CMD.synt_automatic_slave_orbital_correction_flag", CTLRX_CC_FLAG_WHEN_SET, nullptr},
    {"FLAT_CMD.synt_optimal_resolution_flag", CTLRX_CC_TEXT, nullptr},
    {"MAIN_CMD.in_master_file_name", CTLRX_CC_TEXT, sMainHeading},
    {"MAIN_CMD.in_slave_file_name", CTLRX_CC_TEXT, nullptr},
    {"MAIN_CMD.out_root_file_name", CTLRX_CC_TEXT, nullptr},
    {"MAIN_CMD.input_param_file_name", CTLRX_CC_TEXT, nullptr},
    {"MAIN_CMD.compute_param_flag", CTLRX_CC_FLAG, nullptr},
    {"MAIN_CMD.baseline", CTLRX_CC_TEXT, nullptr},
    {"MAIN_CMD.coherence_corr_box_size", CTLRX_CC_TEXT, nullptr},
    {"MAIN_CMD.az_looks", CTLRX_CC_TEXT, nullptr},
    {"MAIN_CMD.rg_looks", CTLRX_CC_TEXT, nullptr},
    {"MAIN_CMD.adat_filter_flag", CTLRX_CC_FLAG, nullptr},
    {"MAIN_CMD.fa_low_snr", CTLRX_CC_TEXT, nullptr},
    {"MAIN_CMD.fa_width", CTLRX_CC_TEXT, nullptr},
    {"MAIN_CMD.shut_flag", CTLRX_CC_FLAG, nullptr},
    {"MAIN_CMD.make_tiff", CTLRX_CC_FLAG, nullptr},
    {"MAIN_CMD.saturation_default", CTLRX_CC_TEXT, nullptr},
};

// The settings as the argument vectors pass them, by field name.
using TCoherenceSettings = std::map<std::string, std::string>;

const char *fdfFlagText(bool theOn) { return theOn ? "OK" : "NotOK"; }

// The co-registration writes its parameter file in XML form (".sml" for a
// name ending in "_par"), where the steps then read it.
std::string fdfWrittenParameterFile(const std::string &theName) {
  return fdfXmlHeaderFileName(fdfHeaderFileName(theName));
}

bool fdfHoldsValue(const CDescription &theParameters, const char *theKey) {
  const CDescriptionField *aField = theParameters.findField(theKey);
  return aField != nullptr && aField->holdsValue();
}

// Reads one key and logs it as "\n<field>: [value]", flags as TRUE or FALSE.
void fdfReadKey(const CDescription &theParameters, const SCoherenceKey &theKey, TCoherenceSettings &theSettings) {
  const std::string aKey = theKey.mKey, aName = aKey.substr(aKey.find('.') + 1);
  if (theKey.mHeading != nullptr)
    fdfLogMessage("%s%s\n\n", theKey.mHeading, std::string(CTLRX_CC_STARS, '*').c_str());
  char aText[512]; // a double in "%lf" needs up to 317 characters
  switch (theKey.mKind) {
  case CTLRX_CC_FLAG_WHEN_SET:
    if (!fdfHoldsValue(theParameters, theKey.mKey)) {
      theSettings[aName] = CTLRX_CC_NOT_OK;
      return;
    }
    // fall through
  case CTLRX_CC_FLAG:
  case CTLRX_CC_FLAG_ON_WHEN_ABSENT: {
    const bool aOn = fdfHoldsValue(theParameters, theKey.mKey)
                         ? fdfIsSwitchOn(theParameters.getFieldWithValue(theKey.mKey).getString())
                         : theKey.mKind == CTLRX_CC_FLAG_ON_WHEN_ABSENT;
    theSettings[aName] = fdfFlagText(aOn);
    fdfLogMessage("\n%s: [%s]", aName.c_str(), aOn ? "TRUE" : "FALSE");
    return;
  }
  case CTLRX_CC_INTEGER:
    std::snprintf(aText, sizeof aText, "%d", theParameters.getFieldWithValue(theKey.mKey).getInteger());
    break;
  case CTLRX_CC_REAL:
    std::snprintf(aText, sizeof aText, "%lf", theParameters.getFieldWithValue(theKey.mKey).getDouble());
    break;
  case CTLRX_CC_TEXT:
    theSettings[aName] = theParameters.getFieldWithValue(theKey.mKey).getString();
    fdfLogMessage("\n%s: [%s]", aName.c_str(), theSettings[aName].c_str());
    return;
  }
  theSettings[aName] = aText;
  fdfLogMessage("\n%s: [%s]", aName.c_str(), aText);
}

// Numbers that reach the steps as text are checked before the first step:
// a bad window should not surface after an hour of interferogram.
void fdfCheckNumbers(const TCoherenceSettings &theSettings) {
  fdfIntegerToken(theSettings.at("coherence_corr_box_size").c_str(), "MAIN_CMD.coherence_corr_box_size",
                  CTLRX_ERR_PARAMETER_FILE);
  if (fdfIsSwitchOn(theSettings.at("adat_filter_flag"))) {
    fdfRealToken(theSettings.at("fa_low_snr").c_str(), "MAIN_CMD.fa_low_snr", CTLRX_ERR_PARAMETER_FILE);
    fdfRealToken(theSettings.at("fa_width").c_str(), "MAIN_CMD.fa_width", CTLRX_ERR_PARAMETER_FILE);
  }
  if (fdfIsSwitchOn(theSettings.at("make_tiff")))
    fdfRealToken(theSettings.at("saturation_default").c_str(), "MAIN_CMD.saturation_default",
                 CTLRX_ERR_PARAMETER_FILE);
}

// Everything the chain reads or writes, listed before anything is written.
void fdfRefuseClashes(const char *theFile, const TCoherenceSettings &theSettings, const SCoherenceNames &theNames,
                      const std::string &theParameterFile) {
  CRunFiles aFiles;
  aFiles.addRead(theFile);
  aFiles.addInput(theSettings.at("in_master_file_name"));
  aFiles.addInput(theSettings.at("in_slave_file_name"));
  if (fdfExistFile(theSettings.at("in_dem_file_name").c_str()))
    aFiles.addInput(theSettings.at("in_dem_file_name"));
  aFiles.addWrite(theParameterFile);
  aFiles.addWrite(fdfWrittenParameterFile(theParameterFile));
  const std::string &r = theNames.mRoot;
  for (const std::string &aResult : {theNames.mMasterPower, theNames.mSlavePower, r + "_int", r + "_sint",
                                     r + "_dint"})
    aFiles.addResult(aResult, false);
  if (fdfIsSwitchOn(theSettings.at("adat_filter_flag")))
    aFiles.addResult(r + "_fint", false);
  aFiles.addResult(r + "_cc", fdfIsSwitchOn(theSettings.at("make_tiff")));
  aFiles.refuseClashes(CTLRX_ERR_PARAMETER_FILE);
}

// Arguments 1.. of each step of the table, as the step programs take them.
std::vector<std::string> fdfStepArguments(int theStep, const TCoherenceSettings &s, const SCoherenceNames &theNames,
                                          const std::string &theParameterFile) {
  const std::string &r = theNames.mRoot;
  const bool aFilter = fdfIsSwitchOn(s.at("adat_filter_flag"));
  switch (theStep) {
  case CTLRX_CC_INTERFEROGRAM:
    return {s.at("in_master_file_name"), s.at("in_slave_file_name"), theParameterFile, theNames.mMasterPower,
            theNames.mSlavePower, r + "_int", s.at("rg_looks"), s.at("az_looks"), CTLRX_CC_NOT_OK,
            CTLRX_CC_NOT_OK, s.at("int_spectral_shift_filter_flag"), s.at("int_doppler_filter_flag"),
            s.at("int_blocksize"), s.at("int_block_overlap")};
  case CTLRX_CC_SYNTHETIC:
    return {theNames.mMasterPower, theNames.mSlavePower, "NotOK", s.at("in_dem_file_name"),
            s.at("in_gcp_file_name"), s.at("synt_phase_interp_box_size"), s.at("synt_phase_mean_box_size"),
            s.at("synt_phase_orbit_interp_val"), r, s.at("synt_optimal_resolution_flag"), "NotOK", "NotOK",
            "NotOK", s.at("synt_resamp_grid_size"), s.at("synt_automatic_slave_orbital_correction_flag"), "NotOK",
            theParameterFile, "1", "1", "OK", "NotOK", "NotOK", "NotOK"};
  case CTLRX_CC_FLATTENING:
    return {r + "_int", r + "_sint", r, "NotOK", "NotOK", "NotOK"};
  case CTLRX_CC_FILTER:
    return {r + "_dint", r + "_fint", s.at("fa_low_snr"), s.at("fa_width")};
  case CTLRX_CC_COHERENCE:
    return {aFilter ? r + "_fint" : r + "_dint", theNames.mMasterPower, theNames.mSlavePower, r + "_cc",
            s.at("coherence_corr_box_size")};
  case CTLRX_CC_TIFF:
    return {r + "_cc", r + "_cc.tif", s.at("saturation_default"), "1", "1"};
  default:
    return {};
  }
}

int32_t fdfRunCoherence(const char *theArguments) {
  const char *aFile = theArguments != nullptr ? theArguments : "";
  const CStepRunner aRunner(sCoherenceSteps, "INT");
  fdfStartProcess(nullptr, 0, CTLRX_CC_TITLE, "\nCO-REGISTRATION PARAMETERS\n\n");
  CDescription aParameters;
  fdfLoadCommandParameters(CTLRX_CC_SCHEMA, {"COREGISTRATION_CMD", "MAIN_CMD", "INTERF_CMD", "FLAT_CMD"}, aFile,
                           aParameters);
  TCoherenceSettings aSettings;
  for (const SCoherenceKey &aKey : sCoherenceKeys)
    fdfReadKey(aParameters, aKey, aSettings);
  // An empty root would scatter "_int" and the rest over the current folder.
  if (aSettings.at("out_root_file_name").empty()) {
    fdfLogMessage("\nEmpty out_root_file_name: [%s]", aFile);
    TLRX_RAISE(CTLRX_ERR_PARAMETER_FILE, "MAIN_CMD.out_root_file_name");
  }
  const std::string aParameterFile = aSettings.at("input_param_file_name") == CTLRX_CC_NOT_OK
                                         ? aSettings.at("out_root_file_name") + "_par"
                                         : aSettings.at("input_param_file_name");
  const bool aCompute = fdfIsSwitchOn(aSettings.at("compute_param_flag")) ||
                        !(fdfExistFile(aParameterFile.c_str()) ||
                          fdfExistFile(fdfWrittenParameterFile(aParameterFile).c_str()));
  const int32_t aRangeLooks =
      fdfIntegerToken(aSettings.at("rg_looks").c_str(), "MAIN_CMD.rg_looks", CTLRX_ERR_PARAMETER_FILE);
  const int32_t aAzimuthLooks =
      fdfIntegerToken(aSettings.at("az_looks").c_str(), "MAIN_CMD.az_looks", CTLRX_ERR_PARAMETER_FILE);
  fdfCheckNumbers(aSettings);
  const SCoherenceNames aNames = fdfCoherenceNames(aSettings.at("out_root_file_name"),
                                                   aSettings.at("in_master_file_name"),
                                                   aSettings.at("in_slave_file_name"));
  fdfLogMessage("\nINPUT MASTER FILE NAME : [ %s ]\nINPUT SLAVE FILE NAME : [ %s ]\n\nOUTPUT MASTER FILE NAME : [ %s "
                "]\nOUTPUT SLAVE FILE NAME : [ %s ]\nOUTPUT ROOT FILE NAME : [ %s ]\n\nNBR RANGE LOOKS : [ %s ]\nNBR "
                "AZIMUTH LOOKS : [ %s ]\n",
                aSettings.at("in_master_file_name").c_str(), aSettings.at("in_slave_file_name").c_str(),
                aNames.mMasterPower.c_str(), aNames.mSlavePower.c_str(), aNames.mRoot.c_str(),
                aSettings.at("rg_looks").c_str(), aSettings.at("az_looks").c_str());
  fdfRefuseClashes(aFile, aSettings, aNames, aParameterFile);
  if (aCompute) {
    // No orbit data here: an orbit initialisation asked for is switched off.
    STLRXCoregSwitches aSwitches;
    aSwitches.mAllowOrbits = false;
    aSwitches.mCommandFile = aFile;
    fdfCoregistration(aSettings.at("in_master_file_name").c_str(), aSettings.at("in_slave_file_name").c_str(),
                      aParameterFile.c_str(), aParameters, aRangeLooks, aAzimuthLooks, aSwitches);
  }
  const std::vector<int> aPlan = fdfCoherencePlan(true, 0, fdfIsSwitchOn(aSettings.at("adat_filter_flag")),
                                                  fdfIsSwitchOn(aSettings.at("make_tiff")));
  for (size_t i = 0; i < aPlan.size(); ++i)
    fdfTraceMessage("\nPlan (%d) step %d %s", static_cast<int>(i), aPlan[i],
                    sCoherenceSteps[static_cast<size_t>(aPlan[i])].mName);
  // Intermediate rasters stay unless the closing operations are asked for.
  const bool aShut = fdfIsSwitchOn(aSettings.at("shut_flag"));
  return aRunner.run(aPlan, [&](int, int theStep) {
    return fdfStepArguments(theStep, aSettings, aNames, aParameterFile);
  }, aShut);
}

bool fdfEndsWith(const std::string &theName, const std::string &theSuffix, bool theIgnoreCase) {
  if (theName.size() < theSuffix.size())
    return false;
  const size_t aStart = theName.size() - theSuffix.size();
  for (size_t i = 0; i < theSuffix.size(); ++i) {
    const unsigned char a = static_cast<unsigned char>(theName[aStart + i]);
    const unsigned char b = static_cast<unsigned char>(theSuffix[i]);
    if (theIgnoreCase ? std::tolower(a) != std::tolower(b) : a != b)
      return false;
  }
  return true;
}

} // namespace

std::string fdfCutSuffix(const std::string &theName, const char *theSuffix) {
  const std::string aSuffix = theSuffix;
  if (fdfEndsWith(theName, aSuffix, false) || fdfEndsWith(theName, aSuffix, true))
    return theName.substr(0, theName.size() - aSuffix.size());
  return theName;
}

SCoherenceNames fdfCoherenceNames(const std::string &theOutputRoot, const std::string &theMaster,
                                  const std::string &theSlave) {
  SCoherenceNames aNames;
  aNames.mRoot = fdfCutSuffix(theOutputRoot, "_cc");
  std::string aName, aExt;
  fdfSplitPath(aNames.mRoot, aNames.mFolder, aName, aExt);
  const auto aPower = [&](const std::string &theImage) {
    std::string aDir, aBase, aExtension;
    fdfSplitPath(theImage, aDir, aBase, aExtension);
    return aNames.mFolder + fdfCutSuffix(aBase, "_slc") + "_pwr";
  };
  aNames.mMasterPower = aPower(theMaster);
  aNames.mSlavePower = aPower(theSlave);
  return aNames;
}

std::vector<int> fdfCoherencePlan(bool theSplit, int theOrbitMethod, bool theFilter, bool theTiff) {
  std::vector<int> aPlan = {CTLRX_CC_INTERFEROGRAM};
  if (theSplit) {
    aPlan.push_back(CTLRX_CC_SYNTHETIC);
    aPlan.push_back(CTLRX_CC_FLATTENING);
  } else {
    if (theOrbitMethod != 0 && theOrbitMethod != 1)
      TLRX_RAISE(CTLRX_ERR_PARAMETER_FILE, nullptr);
    aPlan.push_back(theOrbitMethod == 0 ? CTLRX_CC_ORBIT_FIRST : CTLRX_CC_ORBIT_SECOND);
    aPlan.push_back(CTLRX_CC_PHASE_SLOPE);
  }
  if (theFilter)
    aPlan.push_back(CTLRX_CC_FILTER);
  aPlan.push_back(CTLRX_CC_COHERENCE);
  if (theTiff)
    aPlan.push_back(CTLRX_CC_TIFF);
  return aPlan;
}

// Errors of the numeric library keep their own text.
int32_t main_coherence(const char *theArguments) { return fdfRunGuardedDriver(fdfRunCoherence, theArguments, true); }
