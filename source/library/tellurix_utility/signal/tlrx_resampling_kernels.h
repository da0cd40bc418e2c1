// One-dimensional resampling kernels of the geocoded image stack. Positions
// are in cell units with the centre of cell j at j; a two-dimensional kernel
// is the product of a line and a pixel kernel.
//
// - nearest neighbour: the cell at floor(position + 0.5);
// - bilinear: cells j0, j0 + 1 (j0 = floor(position)), linear weights;
// - "3th_order_cc": Keys cubic convolution, a = -0.5, 4 cells j0 - 1 .. j0 + 2
//   (reproduces polynomials up to degree 2);
// - "4th_order_cc": Keys' six-point cubic convolution, cells j0 - 2 .. j0 + 3
//   (reproduces polynomials up to degree 3);
// - "sinc_interpolation": sinc windowed by a 4-lobe Lanczos window, 8 cells
//   j0 - 3 .. j0 + 4, weights normalised to sum 1 (exact on constants and at
//   whole positions);
// - "mean" and "weight": the input cells that the output cell's footprint
//   [position - half, position + half] overlaps, with equal weights ("mean")
//   or weights by overlap ("weight").
// An interpolating kernel cannot be applied where one of its cells is outside
// the image or holds no data; it then falls back one step at a time: sinc ->
// fourth order -> third order -> bilinear -> nearest neighbour. The footprint
// kernels skip such cells instead.
#pragma once

#include <cstdint>
#include <string>

enum class ETLRXKernel { NEAREST, BILINEAR, CUBIC3, CUBIC4, SINC, MEAN, WEIGHT };

constexpr int32_t CTLRX_KERNEL_MAX_TAPS = 8;

// Cells mFirst .. mFirst + mCount - 1 with their weights.
struct SKernelTaps {
  int32_t mFirst = 0;
  int32_t mCount = 0;
  double mWeight[CTLRX_KERNEL_MAX_TAPS] = {};
};

// The kernel of an interpolation name (exact, case-sensitive); any other
// text is nearest neighbour and clears theKnown.
ETLRXKernel fdfKernelFromName(const std::string &theName, bool &theKnown);
const char *fdfKernelName(ETLRXKernel theKernel);
// The kernel that stands in when theKernel cannot be applied; NEAREST for
// nearest neighbour itself and for the footprint kernels, which skip the
// cells they cannot use instead.
ETLRXKernel fdfKernelFallback(ETLRXKernel theKernel);
bool fdfIsFootprintKernel(ETLRXKernel theKernel);
// Number of cells of an interpolating kernel (1 for nearest neighbour).
int32_t fdfKernelTapCount(ETLRXKernel theKernel);

// Taps of an interpolating kernel (or nearest neighbour) at thePosition.
void fdfInterpolationTaps(ETLRXKernel theKernel, double thePosition, SKernelTaps &theTaps);
// Taps of a footprint kernel: cells overlapped by more than 1e-9 of a cell.
// Weights are 1 ("mean") or the overlap ("weight"). False when the footprint
// spans more than CTLRX_KERNEL_MAX_TAPS cells.
bool fdfFootprintTaps(ETLRXKernel theKernel, double thePosition, double theHalfWidth, SKernelTaps &theTaps);
