// Correlation command: a coherence image estimated from the intensity
// correlation of two co-registered images, and optionally its GeoTIFF.
#pragma once

#include <cstdint>

// Driver of "main_correlation#": theArguments names the argument file.
int32_t main_correlation(const char *theArguments);
