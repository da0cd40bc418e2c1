// The three simulations: a dated time series, a correlated pair, a constant
// image. Each writes its rasters line by line and, for series and pair, the
// list file of the written names. Failures are raised through the runtime.
#pragma once

#include "tlrx_sim_options.h"

void fdfSimWriteSeries(const SSimOptions &theOptions);
void fdfSimWritePair(const SSimOptions &theOptions);
void fdfSimWriteConstant(const SSimOptions &theOptions);

// Runs the command named in the options.
void fdfSimRun(const SSimOptions &theOptions);
