#include "tlrx_sim_coherence_file.h"

#include <algorithm>
#include <cstdio>
#include <string>
#include <utility>
#include <vector>

#include "tlrx_errors.h"

namespace {

using TSimKeys = std::vector<std::pair<const char *, std::string>>;

// The largest power of two not above theValue (at least 8).
int32_t powerOfTwoBelow(int32_t theValue) {
  int32_t aPower = 8;
  while (aPower * 2 <= theValue)
    aPower *= 2;
  return aPower;
}

// Windows of the co-registration stages: 256 / 128 / 64 on images of 512
// and more, halved with the image below that.
TSimKeys coregistrationKeys(const SSimOptions &theOptions) {
  const int32_t aSide = std::min(theOptions.mLines, theOptions.mPixels);
  const std::string aInit = std::to_string(std::min(256, powerOfTwoBelow(aSide / 2)));
  const std::string aCoarse = std::to_string(std::min(128, powerOfTwoBelow(aSide / 4)));
  const std::string aFine = std::to_string(std::min(64, powerOfTwoBelow(aSide / 8)));
  const std::string aBorder = std::to_string(std::min(32, aSide / 16));
  return {{"cc_start_shift_range", "0"}, {"cc_start_shift_azimuth", "0"}, {"cc_init_from_orbits_flag", "NotOK"},
          {"cc_init_from_amplitude_flag", "OK"}, {"cc_init_from_coherence_flag", "NotOK"},
          {"cc_number_coeff_range", "3"}, {"cc_number_coeff_azimuth", "3"}, {"cc_number_res_coeff_range", "1"},
          {"cc_number_res_coeff_azimuth", "1"}, {"cc_border_dinstance_range", aBorder},
          {"cc_border_dinstance_azimuth", aBorder}, {"cc_range_shift_dinst_multiple", "2"},
          {"cc_azimuth_shift_dinst_multiple", "2"}, {"cc_maximize_the_variance_flag", "NotOK"},
          {"cc_variance_threshold", "0"}, {"cc_orbit_interpolation", "0"}, {"input_shape_file_name", "NotOK"},
          {"cc_activate_test_on_orbit_flag", "NotOK"}, {"cc_range_win_size_test", aFine},
          {"cc_azimuth_win_size_test", aFine}, {"cc_max_shift_test", "5"}, {"cc_validity_threshold_test", "0.2"},
          {"cc_init_range_win_size", aInit}, {"cc_init_azimuth_win_size", aInit}, {"cc_init_range_position", "-1"},
          {"cc_init_azimuth_position", "-1"}, {"cc_range_win_number_cc", "4"}, {"cc_azimuth_win_number_cc", "4"},
          {"cc_range_win_size_cc", aCoarse}, {"cc_azimuth_win_size_cc", aCoarse}, {"cc_oversampling_cc", "8"},
          {"cc_validity_threshold_cc", "0.2"}, {"cc_oversampling_fine", "16"}, {"cc_range_win_number_fine", "12"},
          {"cc_azimuth_win_number_fine", "12"}, {"cc_range_win_size_fine", aFine},
          {"cc_azimuth_win_size_fine", aFine}, {"cc_SNR_threshold", "20"}, {"cc_oversampling_coherence", "16"},
          {"cc_coh_reject_threshold", "0.3"}};
}

TSimKeys mainKeys(const SSimOptions &theOptions) {
  return {{"in_master_file_name", fdfSimImageName(theOptions, 1)},
          {"in_slave_file_name", fdfSimImageName(theOptions, 2)},
          {"out_root_file_name", theOptions.mOut + "_cc"}, {"input_param_file_name", "NotOK"},
          {"compute_param_flag", "OK"}, {"baseline", "NotOK"}, {"coherence_corr_box_size", "5"},
          {"az_looks", "1"}, {"rg_looks", "1"}, {"adat_filter_flag", "NotOK"}, {"fa_low_snr", "0.25"},
          {"fa_width", "2"}, {"shut_flag", "NotOK"}, {"make_tiff", "OK"}, {"saturation_default", "0.333"},
          {"TellurixEnvironment", "IDL_ENVI_ENV"}};
}

TSimKeys interferogramKeys() {
  return {{"int_spectral_shift_filter_flag", "OK"}, {"int_doppler_filter_flag", "OK"}, {"int_blocksize", "1024"},
          {"int_block_overlap", "50"}};
}

TSimKeys flatteningKeys(const SSimOptions &theOptions) {
  return {{"in_dem_file_name", theOptions.mDemHeight > 0.0 ? theOptions.mOut + "_dem" : "NotOK"},
          {"in_gcp_file_name", "NotOK"}, {"synt_phase_interp_box_size", "10"}, {"synt_phase_mean_box_size", "10"},
          {"synt_phase_orbit_interp_val", "0"}, {"synt_resamp_grid_size", "1.0"},
          {"synt_automatic_slave_orbital_correction_flag", "NotOK"}, {"synt_optimal_resolution_flag", "NotOK"}};
}

// Names are written as they are: a simulator's own names need no escaping
// beyond the three characters XML reserves in text.
std::string escaped(const std::string &theText) {
  std::string aOut;
  for (char c : theText)
    aOut += c == '&' ? "&amp;" : c == '<' ? "&lt;" : c == '>' ? "&gt;" : std::string(1, c);
  return aOut;
}

void writeSection(FILE *theFile, const char *theSection, const TSimKeys &theKeys, bool &theOk) {
  theOk = theOk && std::fprintf(theFile, "  <%s>\n", theSection) > 0;
  for (const auto &aKey : theKeys)
    theOk = theOk && std::fprintf(theFile, "    <%s>%s</%s>\n", aKey.first, escaped(aKey.second).c_str(),
                                  aKey.first) > 0;
  theOk = theOk && std::fprintf(theFile, "  </%s>\n", theSection) > 0;
}

} // namespace

void fdfSimWriteCoherenceParameters(const SSimOptions &theOptions) {
  FILE *aFile = std::fopen(theOptions.mCommandFile.c_str(), "w");
  if (aFile == nullptr)
    TLRX_RAISE(CTLRX_ERR_FILE_WRITE, theOptions.mCommandFile.c_str());
  bool aOk = std::fprintf(aFile, "<?xml version=\"1.0\" ?>\n<HEADER_INFO>\n") > 0;
  writeSection(aFile, "COREGISTRATION_CMD", coregistrationKeys(theOptions), aOk);
  writeSection(aFile, "MAIN_CMD", mainKeys(theOptions), aOk);
  writeSection(aFile, "INTERF_CMD", interferogramKeys(), aOk);
  writeSection(aFile, "FLAT_CMD", flatteningKeys(theOptions), aOk);
  aOk = aOk && std::fprintf(aFile, "</HEADER_INFO>\n") > 0;
  if (std::fclose(aFile) != 0 || !aOk)
    TLRX_RAISE(CTLRX_ERR_FILE_WRITE, theOptions.mCommandFile.c_str());
  std::printf("wrote %s: parameters of the coherence command\n", theOptions.mCommandFile.c_str());
}
