// Step program: the ratio of two co-registered images, linear or in decibels.
#pragma once

#include <cstdint>

// argv[1] input 1, argv[2] input 2, argv[3] output name, argv[4] optional
// decibel switch (non-zero integer). Returns 0 on success.
int ratio_images(int argc, char **argv);
