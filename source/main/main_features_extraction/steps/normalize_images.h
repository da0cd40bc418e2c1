// Step program: the normalisation image of an intensity pair, the average of
// the two local mean intensities in a moving window.
#pragma once

// argv[1] input 1, argv[2] input 2, argv[3] output, argv[4] dummy value (the
// output's null value), argv[5] window rows, argv[6] window columns
// (3 .. 500). Returns 0 on success.
int normalize_images(int argc, char **argv);
