// Step program: the ratio of two co-registered images, linear or in decibels.
#pragma once

#include <cstdint>

// argv[1] input 1, argv[2] input 2, argv[3] output name, argv[4] optional
// decibel switch (non-zero integer). Returns 0 on success.
int ratio_images(int argc, char **argv);

// Printed lines of the ratio histogram.
constexpr int CTLRX_RATIO_HISTOGRAM_CLASSES = 13;
// One line of ratios: theNull where an input is no data or the divisor is
// not above the smallest normal float; theHistogram (12 counting classes:
// below -10, -1, -0.1, 0.1, 1, ..., 1000000, then "Other") counts the output.
// theNullA and theNullB are the inputs' null values (NaN matches NaN).
void fdfRatioLine(const float *theA, double theNullA, const float *theB, double theNullB, int32_t thePixels,
                  bool theDecibel, float theNull, float *theOut, long long *theHistogram);
