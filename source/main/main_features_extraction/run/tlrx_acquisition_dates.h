// Acquisition dates of a dated series, shared by the commands that order
// their inputs in time (min and max, temporal features).
#pragma once

#include <string>
#include <vector>

#include "tlrx_time_man_utility.h"

// The "ACQUISITION TIME" of input theName: a missing or unreadable date logs
// which and raises 848642 naming the key.
STLRXDate fdfReadInputDate(const std::string &theName);

// Reads the acquisition date of every input and sorts names and dates into
// ascending date order (equal dates keep their order).
std::vector<STLRXDate> fdfOrderChronologically(std::vector<std::string> &theNames);
