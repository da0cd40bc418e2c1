// Geocoded image stack: the value of every input of a time series at any
// cell of a common output grid, resampled with one kernel.
//
// Output cell (r, c) is looked up at the position of its centre in each
// input's cells (tlrx_map_grid); a centre outside an input's extent gives
// that input's null value. Inside, the kernel (tlrx_resampling_kernels) is
// applied, falling back to simpler kernels where no data or the image edge
// lies inside its support; a result without data is the input's null value.
//
// Streaming: each input keeps a ring of as many lines as the kernel spans
// and reads an input line only when an output line first needs it, so lines
// are read once when output lines are visited in order and memory does not
// grow with the number of lines. Column positions and weights are computed
// once; the line loop allocates nothing.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "tlrx_map_grid.h"
#include "tlrx_resampling_kernels.h"

class CGeocodedImageStack {
public:
  CGeocodedImageStack();
  ~CGeocodedImageStack();
  CGeocodedImageStack(const CGeocodedImageStack &) = delete;
  CGeocodedImageStack &operator=(const CGeocodedImageStack &) = delete;

  // theListFile: the input names, one a line, up to a "#" line.
  // theGridHeader: raster name of the output grid's header.
  // theInterpType: kernel name (others: nearest neighbour).
  // theWindow: footprint of "mean" and "weight", in output cells (below 1: 1).
  // theClip: non-zero clamps interpolated values to the range of the cells
  // that made them (no overshoot of the cubic and sinc kernels).
  // A missing list, grid header or input raises through the file layers;
  // an empty list or a grid or input without a usable north-up
  // registration traces the reason and returns false.
  bool initialise(const char *theListFile, const char *theGridHeader, const char *theInterpType, int32_t theWindow,
                  int32_t theClip);
  void release();

  // Null value of every input, in list order.
  const std::vector<double> &getNullValues() const { return mNulls; }
  int32_t getInputCount() const { return static_cast<int32_t>(mInputs.size()); }
  const SMapGrid &getGrid() const { return mGrid; }
  ETLRXKernel getKernel() const { return mKernel; }

  // Value of input theInput at output cell (theLine, thePixel); cells
  // outside the grid give the input's null value.
  double value(int32_t theInput, int32_t theLine, int32_t thePixel);
  // The values of input theInput along output line theLine (getGrid().mPixels
  // values).
  void getLine(int32_t theInput, int32_t theLine, double *theDest);

private:
  struct SInput;

  bool addInput(const std::string &theName);
  void prepareLine(SInput &theInput, int32_t theLine);
  double evaluate(const SInput &theInput, int32_t theColumn) const;
  bool applyKernel(const SInput &theInput, int32_t theLevel, int32_t theColumn, double &theValue) const;
  double applyFootprint(const SInput &theInput, int32_t theColumn) const;
  // The values of one line for a kernel of T x T cells, its fallbacks where
  // it cannot be applied.
  template <int T>
  void fillLine(const SInput &theInput, double *theDest) const;

  SMapGrid mGrid;
  ETLRXKernel mKernel = ETLRXKernel::NEAREST;
  std::vector<ETLRXKernel> mChain; // the kernel, then its fallbacks
  int32_t mWindow = 1;
  bool mClip = false;
  std::vector<std::unique_ptr<SInput>> mInputs;
  std::vector<double> mNulls;
};
