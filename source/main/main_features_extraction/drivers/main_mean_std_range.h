// Temporal feature extraction command ("main_temporal_feature_extraction#"):
// per-pixel statistics of a dated series of co-registered or geocoded
// images, one raster per requested feature.
#pragma once

#include <cstdint>

// theArguments names the XML parameter file. Returns 0 on success; failures
// are raised.
int32_t main_mean_std_range(const char *theArguments);
