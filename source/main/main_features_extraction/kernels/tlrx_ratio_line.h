// One line of the ratio of two co-registered images (see tlrx_ratio_line.cpp).
#pragma once

#include <cstdint>

// Printed lines of the ratio histogram; 12 of them count.
constexpr int CTLRX_RATIO_HISTOGRAM_CLASSES = 13;
constexpr int CTLRX_RATIO_COUNTED_CLASSES = 12;
// One line of ratios: theNull where an input is no data or the divisor is
// not above the smallest normal float; theHistogram (12 counting classes:
// below -10, -1, -0.1, 0.1, 1, ..., 1000000, then "Other") counts the output.
// theNullA and theNullB are the inputs' null values (NaN matches NaN).
void fdfRatioLine(const float *theA, double theNullA, const float *theB, double theNullB, int32_t thePixels,
                  bool theDecibel, float theNull, float *theOut, long long *theHistogram);
