// One line of the min-and-max command (see tlrx_min_max_line.cpp).
#pragma once

#include <cstdint>
#include <vector>

// The four result lines of the pass.
struct SMinMax {
  float *mMin, *mMax, *mMinDate, *mMaxDate;
};

// theRows: one line of each input in chronological order; theNulls their
// null values (a NaN null matches NaN); theValid a scratch line of flags.
void fdfMinMaxLine(const std::vector<const float *> &theRows, const std::vector<double> &theNulls,
                   int32_t thePixels, float theNull, std::vector<uint8_t> &theValid, const SMinMax &theOut);
