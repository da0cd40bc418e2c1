// Step program: texture of one radar image, the local coefficient of
// variation of the amplitudes in a moving window.
#pragma once

// argv[1] input, argv[2] output, argv[3] dummy value (not used), argv[4]
// window rows, argv[5] window columns (3 .. 500). Returns 0 on success.
int texture(int argc, char **argv);
