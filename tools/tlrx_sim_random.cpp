// Generator and distributions of the scene simulator.
#include "tlrx_sim_random.h"

#include <cmath>

namespace {

constexpr double CTLRX_SIM_TWO_PI = 6.283185307179586476925286766559;

uint64_t rotateLeft(uint64_t theValue, int theBits) { return (theValue << theBits) | (theValue >> (64 - theBits)); }

} // namespace

uint64_t fdfSimMix(uint64_t theValue) {
  uint64_t aZ = theValue + 0x9e3779b97f4a7c15ull;
  aZ = (aZ ^ (aZ >> 30)) * 0xbf58476d1ce4e5b9ull;
  aZ = (aZ ^ (aZ >> 27)) * 0x94d049bb133111ebull;
  return aZ ^ (aZ >> 31);
}

uint64_t fdfSimKey(uint64_t theSeed, uint64_t theStream, int64_t theA, int64_t theB) {
  uint64_t aKey = fdfSimMix(theSeed);
  aKey = fdfSimMix(aKey ^ theStream);
  aKey = fdfSimMix(aKey ^ static_cast<uint64_t>(theA));
  return fdfSimMix(aKey ^ static_cast<uint64_t>(theB));
}

double fdfSimUnitFromKey(uint64_t theKey) { return (static_cast<double>(theKey >> 11) + 0.5) * 0x1.0p-53; }

CSimRandom::CSimRandom(uint64_t theKey) {
  uint64_t aSeed = theKey;
  for (uint64_t &aWord : mState) {
    aSeed += 0x9e3779b97f4a7c15ull;
    aWord = fdfSimMix(aSeed);
  }
}

uint64_t CSimRandom::next() {
  const uint64_t aResult = rotateLeft(mState[1] * 5, 7) * 9;
  const uint64_t aT = mState[1] << 17;
  mState[2] ^= mState[0];
  mState[3] ^= mState[1];
  mState[1] ^= mState[2];
  mState[0] ^= mState[3];
  mState[2] ^= aT;
  mState[3] = rotateLeft(mState[3], 45);
  return aResult;
}

double CSimRandom::uniform() { return fdfSimUnitFromKey(next()); }

double CSimRandom::normal() {
  if (mHasSpare) {
    mHasSpare = false;
    return mSpare;
  }
  const double aRadius = std::sqrt(-2.0 * std::log(uniform()));
  const double aAngle = CTLRX_SIM_TWO_PI * uniform();
  mSpare = aRadius * std::sin(aAngle);
  mHasSpare = true;
  return aRadius * std::cos(aAngle);
}

double CSimRandom::exponential() { return -std::log(uniform()); }

double CSimRandom::gamma(double theShape) {
  if (theShape == 1.0)
    return exponential();
  const double aD = theShape - 1.0 / 3.0;
  const double aC = 1.0 / std::sqrt(9.0 * aD);
  for (;;) {
    const double aX = normal();
    double aV = 1.0 + aC * aX;
    if (aV <= 0.0)
      continue;
    aV = aV * aV * aV;
    const double aU = uniform();
    const double aX2 = aX * aX;
    if (aU < 1.0 - 0.0331 * aX2 * aX2 || std::log(aU) < 0.5 * aX2 + aD * (1.0 - aV + std::log(aV)))
      return aD * aV;
  }
}
