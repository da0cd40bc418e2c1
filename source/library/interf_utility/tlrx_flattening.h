// Flattening, a step of the coherence chain: the interferogram with the
// synthetic phase removed, R + "_dint" = R + "_int" x e^(-i phase), the
// magnitude (the normalisation) kept.
//
// Arguments (argv[0] the program): 1 the interferogram (FLOAT_COMPLEX), 2 the
// synthetic phase in radians on the interferogram's grid, 3 the output root
// R; the chain passes three more "NotOK" that are not read. A cell that is no
// data in the interferogram (0 + 0i or its null value) or in the phase (its
// declared null value or NaN) is 0 + 0i in the result: a cell whose phase is
// unknown is not left unflattened.
#pragma once

int tlrx_flattening(int argc, char **argv);

// The closing operation: with 7 arguments or more (the program's own name
// included) it removes the interferogram and the synthetic phase with their
// headers, which the flattened interferogram replaces; with fewer it traces
// that nothing is removed.
int tlrx_flattening_close(int argc, char **argv);
