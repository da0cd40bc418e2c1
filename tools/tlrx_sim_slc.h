// Single-look complex pair of the simulator: band-limited circular Gaussian
// speckle, a slave of chosen coherence moved by a known shift, fringes and
// Doppler centroids, with the header fields the interferometric steps read.
#pragma once

#include <complex>
#include <cstdint>
#include <vector>

#include "tlrx_sim_options.h"

// Values of the periodic band-limited signal whose N samples are theSamples
// at the positions theStart + theStep j, j = 0..N-1: the inverse DFT sum
// (1/N) sum_k F_k e^(2 pi i k t / N) over signed frequencies, evaluated
// exactly for all j at once as a chirp-z transform (three FFTs of 2N or more).
void fdfSimEvaluateAffine(std::vector<std::complex<double>> &theSamples, double theStart, double theStep);

void fdfSimWriteSlcPair(const SSimOptions &theOptions);
