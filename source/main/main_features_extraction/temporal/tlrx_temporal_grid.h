// Common output grid of a temporal series, written as a header beside the
// output root and used as the template of every output header.
//
// Non-geocoded inputs share their top-left part: the smallest line and pixel
// counts. Geocoded inputs (all of them, or none) are brought onto the union
// of their extents at the finest spacings (tlrx_map_grid).
#pragma once

#include <cstdint>
#include <string>
#include <vector>

class CDescription;

struct STemporalGridInfo {
  bool mGeocoded = false;
  int32_t mLargestPixels = 0; // largest pixel count of the inputs
};

// Reads the standard header of input theName. A missing header traces
// "Error: missing parameter file " and raises 261122; an unreadable one
// traces "Error while reading parameter file " and raises 261124; both name
// the header.
void fdfReadTemporalInputHeader(const std::string &theName, CDescription &theHeader);

// Reads every input header (as listed; unreadable, or without a usable size
// or registration: 261124 with the header name), checks that all inputs are
// geocoded or none (261124 with the first differing header), and writes the
// grid header theGrid + "_hdr" (failure: 261122). The grid header is a copy
// of the first input's header with the grid's size and registration, FLOAT
// cells of "NUMBER" units, no calibration or rescaling, and the plain record
// layout that the results are written with.
STemporalGridInfo fdfBuildTemporalGrid(const std::vector<std::string> &theInputs, const std::string &theGrid);
