// Internals shared by the per-pixel statistics and the block computation
// of CTemporalSeries (tlrx_temporal_statistics.cpp, tlrx_temporal_block.cpp).
#pragma once

#include <cstdint>
#include <limits>

// The block loops are also compiled for AVX2 (twice the lanes of the x86-64
// baseline), chosen at run time where the processor has it. No FMA is
// involved, so both versions give the same results bit for bit.
#if defined(__x86_64__) && defined(__has_attribute)
#if __has_attribute(target_clones)
#define TLRX_VECTOR_CLONES __attribute__((target_clones("avx2", "default")))
#endif
#endif
#ifndef TLRX_VECTOR_CLONES
#define TLRX_VECTOR_CLONES
#endif

namespace tlrx_temporal_detail {

inline constexpr double CTLRX_FLOAT_MAX = 3.4028234663852886e+38;
inline constexpr double CTLRX_RESCALE_LIMIT = 1e14; // as in CTemporalAccumulator::scaledAdd
// Relative distance from the rate limit beyond which a product decides the
// selection's rate test without its divisions (several units in the last
// place of every rounding involved).
inline constexpr double CTLRX_RATE_MARGIN = 1e-15;
// Pixels per block, the longest series that blocks take, and the smallest
// sample they take (see gatherBlock).
inline constexpr int32_t CTLRX_BLOCK_SIZE = 256;
inline constexpr int32_t CTLRX_BLOCK_INPUTS = 64;
inline constexpr double CTLRX_BLOCK_SMALLEST = 1e-15;

// Double to float, infinite beyond the float range (a plain conversion of
// such a value is undefined).
inline float fdfToFloat(double theValue) {
  if (theValue > CTLRX_FLOAT_MAX)
    return std::numeric_limits<float>::infinity();
  if (theValue < -CTLRX_FLOAT_MAX)
    return -std::numeric_limits<float>::infinity();
  return static_cast<float>(theValue);
}

// One compare-exchange of a sorting network.
struct SExchange {
  int mLow, mHigh;
};

// Compare-exchanges of Batcher's odd-even merge sort of theCount values,
// written to theOut when given; returns their number.
constexpr int fdfBatcher(int theCount, SExchange *theOut) {
  int aSize = 0;
  for (int p = 1; p < theCount; p *= 2)
    for (int k = p; k >= 1; k /= 2)
      for (int j = k % p; j + k < theCount; j += 2 * k)
        for (int i = 0; i < k && i < theCount - j - k; ++i)
          if ((i + j) / (2 * p) == (i + j + k) / (2 * p)) {
            if (theOut != nullptr)
              theOut[aSize] = {i + j, i + j + k};
            ++aSize;
          }
  return aSize;
}

} // namespace tlrx_temporal_detail
