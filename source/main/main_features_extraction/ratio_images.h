// Step program: the ratio of two co-registered images, linear or in decibels.
#pragma once

// argv[1] input 1, argv[2] input 2, argv[3] output name, argv[4] optional
// decibel switch (non-zero integer). Returns 0 on success.
int ratio_images(int argc, char **argv);

// Histogram classes of the ratio values, in counting order.
constexpr int CTLRX_RATIO_HISTOGRAM_CLASSES = 13;
// Index of the histogram class of theValue (the "0.01" class is never chosen).
int fdfRatioHistogramClass(double theValue);
// Ratio of one pixel pair: theNull where an input is no data or the divisor
// is not above the smallest normal float.
float fdfRatioPixel(double theA, bool theValidA, double theB, bool theValidB, bool theDecibel, float theNull);
