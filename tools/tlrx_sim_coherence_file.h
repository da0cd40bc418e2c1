// The coherence command's parameter file for a simulated pair, so that a
// pair is ready to run: its images, the output root, one look, a 5 x 5
// window, co-registration windows sized to the image, the elevation model
// when one was written.
#pragma once

#include "tlrx_sim_options.h"

void fdfSimWriteCoherenceParameters(const SSimOptions &theOptions);
