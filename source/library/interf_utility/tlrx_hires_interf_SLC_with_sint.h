// Interferogram generation, the first step of the coherence chain: the slave
// of a single-look complex pair resampled onto the master grid by the
// co-registration polynomials (or two shift rasters), the optional range
// spectral-shift and azimuth Doppler common-band filters, the product master x
// conj(slave) on a range grid oversampled by 2, its multilook, and three
// results: the interferogram normalised by the multilooked powers (magnitude
// at most 1, 0 + 0i where a power is 0) and the two power images as multilook
// means.
//
// Arguments (argv[0] the program): 1 master, 2 slave, 3 parameter file with
// the polynomials (written back with "ProcessedPixels" and "SpectralShift"),
// 4 master power, 5 slave power, 6 interferogram, 7 range looks, 8 azimuth
// looks, 9 synthetic phase raster or "NotOK", 10 not read, 11 "OK" spectral
// shift filter, 12 "OK" Doppler filter, 13 block size (5000), 14 block overlap
// (50), 15 and 16 local incidence rasters, 17 and 18 range and azimuth shift
// rasters, 19 not read, 20 "OK" writes the interpolation kernel, 21 "OK"
// writes the co-registered pair (folder of the interferogram + input name +
// "_rsp").
//
// The images stream in bands of lines: every estimate (Doppler centroid,
// fringe frequency per group of CTLRX_FRINGE_GROUP lines) and every multilook
// sum is anchored to absolute line numbers, and each resampled, filtered or
// summed line is a function of its line number alone, so the result depends
// neither on the block size nor on the thread count. Memory holds a band of
// lines per raster (blocks of whole groups and looks, two per thread) whatever
// the image height.
#pragma once

#include <cstdint>

// Lines per spectral-shift estimate; groups start at multiples of it.
constexpr int32_t CTLRX_FRINGE_GROUP = 16;

int tlrx_hires_interf_SLC_with_sint(int argc, char **argv);
