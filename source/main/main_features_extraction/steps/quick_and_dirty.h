// Step program: coherence of an intensity pair from the correlation of its
// normalised intensities in a moving window, and its closing operation.
#pragma once

// argv[1] input 1, argv[2] input 2, argv[3] normalisation image (from
// normalize_images), argv[4] output, argv[5] dummy value (not used), argv[6]
// window rows, argv[7] window columns (3 .. 500). Returns 0 on success.
int quick_and_dirty(int argc, char **argv);

// Closing operation, run after a successful step when the command asks for
// it: removes the normalisation image argv[3] with its header files, the one
// intermediate file of the correlation command.
int quick_and_dirty_close(int argc, char **argv);
