// Texture command: the texture image of one radar image and, on request, its
// GeoTIFF quick-look.
#pragma once

#include <cstdint>

// Driver of "main_texture#": theArguments names the argument file.
int32_t main_texture(const char *theArguments);
