// Coherence estimation, the step "coherence generation" of the coherence
// chain: the coherence of master and slave over a moving window from the
// normalised (flattened, possibly filtered) interferogram and the two power
// images (measure: tlrx_coherence_measure.h).
//
// Arguments (argv[0] the program): 1 interferogram, 2 master power, 3 slave
// power, 4 output, 5 range window Wr, 6 azimuth window Wa (Wr), 7 and 8 the
// range and azimuth windows Fr, Fa of the local fringe-frequency removal (off;
// Fa = Fr), 9 an auxiliary raster, 10 to 13 the processing window xmin, xmax,
// ymin, ymax (the whole image).
//
// What the arguments leave open is settled so:
// - the processing window crops the inputs: the result is that of the
//   sub-image, its first line and column are ymin and xmin, and its borders
//   (ha lines, hr columns) are counted inside it;
// - with local-frequency removal, window line k starts at phase k x fa, so the
//   removed ramp is the plane of the two estimated frequencies;
// - argument 9 must name a raster with a header (the chain's own check that
//   the removal has what it needs) and is otherwise not read: both frequencies
//   are measured on the interferogram.
// Without local-frequency removal the sums are running sums (cost per pixel
// independent of the window); with it every window removes its own ramp, so
// they are summed directly over the window.
#pragma once

int tlrx_cc_ave(int argc, char **argv);

// The closing operation: with 4 arguments or more after the program name it
// removes the interferogram and both power images with their headers; with
// fewer it traces that nothing is removed.
int tlrx_cc_ave_close(int argc, char **argv);
