// Deterministic random numbers of the scene simulator: the same seed gives the
// same files on every machine, so the generator and every distribution are
// our own code (the standard library leaves its distributions unspecified).
#pragma once

#include <cstdint>

// Stream identifiers: each kind of randomness of an image draws from its own
// stream, so switching no-data pixels on or off leaves the speckle unchanged.
constexpr uint64_t CTLRX_SIM_STREAM_SPECKLE = 1;
constexpr uint64_t CTLRX_SIM_STREAM_NODATA = 2;
constexpr uint64_t CTLRX_SIM_STREAM_FIELDS = 3;
constexpr uint64_t CTLRX_SIM_STREAM_PAIR = 4;

// SplitMix64 finaliser: a well-mixed 64-bit value of its argument.
uint64_t fdfSimMix(uint64_t theValue);
// A key for (seed, stream, index a, index b), mixed so that neighbouring
// indices give unrelated keys.
uint64_t fdfSimKey(uint64_t theSeed, uint64_t theStream, int64_t theA, int64_t theB = 0);
// Uniform in the open interval (0, 1) from a 64-bit key.
double fdfSimUnitFromKey(uint64_t theKey);

// xoshiro256** generator, seeded through SplitMix64.
class CSimRandom {
public:
  explicit CSimRandom(uint64_t theKey);

  uint64_t next();
  // Uniform in the open interval (0, 1): never 0 (log) and never 1.
  double uniform();
  // Standard normal (Box-Muller, the second value kept for the next call).
  double normal();
  // Exponential of mean 1.
  double exponential();
  // Gamma of shape theShape (>= 1) and scale 1 (Marsaglia and Tsang).
  double gamma(double theShape);

private:
  uint64_t mState[4];
  bool mHasSpare = false;
  double mSpare = 0.0;
};
