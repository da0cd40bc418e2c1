// Coherence measure (see tlrx_coherence_measure.h).
#include "tlrx_coherence_measure.h"

#include <cmath>

void fdfCoherencePrepare(std::complex<float> *theZ, const uint8_t *theZValid, float *theM, const uint8_t *theMValid,
                         float *theS, const uint8_t *theSValid, int32_t thePixels, const SCoherenceInputs &theInputs,
                         uint8_t *theInvalid) {
  for (int32_t j = 0; j < thePixels; ++j) {
    const bool aValid = theZValid[j] != 0 && theMValid[j] != 0 && theSValid[j] != 0 && std::isfinite(theM[j]) &&
                        std::isfinite(theS[j]) && std::isfinite(theZ[j].real()) && std::isfinite(theZ[j].imag());
    if (!aValid) {
      theZ[j] = std::complex<float>();
      theM[j] = theS[j] = 0.0f;
      theInvalid[j] = 1;
      continue;
    }
    if (!theInputs.mWideSwath) {
      if (theInputs.mMasterAmplitude)
        theM[j] *= theM[j];
      if (theInputs.mSlaveAmplitude)
        theS[j] *= theS[j];
      theZ[j] *= static_cast<float>(std::sqrt(std::fabs(double(theM[j]) * theS[j])));
    }
    theInvalid[j] = theZ[j] == std::complex<float>() ? 1 : 0;
  }
}

void fdfCoherenceTerms(const std::complex<float> *theZ, const float *theM, const float *theS,
                       const uint8_t *theInvalid, int32_t thePixels, double *const *theTerms, uint8_t *theCentre) {
  for (int32_t j = 0; j < thePixels; ++j) {
    const bool aValid = theInvalid[j] == 0;
    theTerms[0][j] = aValid ? theM[j] : 0.0;
    theTerms[1][j] = aValid ? theS[j] : 0.0;
    theTerms[2][j] = aValid ? theZ[j].real() : 0.0;
    theTerms[3][j] = aValid ? theZ[j].imag() : 0.0;
    theTerms[4][j] = aValid ? 0.0 : 1.0;
    theCentre[j] = 1;
  }
}

void fdfCoherenceLine(const double *const *theSums, const uint8_t *theCentre, int32_t thePixels, float theNull,
                      float *theOut) {
  for (int32_t j = 0; j < thePixels; ++j)
    theOut[j] = theCentre[j] == 0 || theSums[4][j] != 0.0
                    ? theNull
                    : fdfCoherenceValue(theSums[0][j], theSums[1][j], theSums[2][j], theSums[3][j], theNull);
}

bool fdfLocalFrequency(const SPhaseDifferences &theRange, const SPhaseDifferences &theAzimuth,
                       int32_t theFirstColumn, int32_t theColumns, int32_t theLines, double &theRangeFrequency,
                       double &theAzimuthFrequency) {
  const SPhaseDifferences *aAxes[2] = {&theRange, &theAzimuth};
  double aResult[2];
  for (int a = 0; a < 2; ++a) {
    double aAngles = 0.0;
    std::complex<double> aMean;
    for (int32_t k = 0; k < theLines; ++k) {
      const std::complex<float> *aDiffs = aAxes[a]->mDiffs[k] + theFirstColumn;
      const float *aLineAngles = aAxes[a]->mAngles[k] + theFirstColumn;
      for (int32_t c = 0; c < theColumns; ++c) {
        if (aDiffs[c] == std::complex<float>())
          return false;
        aAngles += aLineAngles[c];
        aMean += std::complex<double>(aDiffs[c]);
      }
    }
    aResult[a] = 0.5 * (aAngles / (double(theLines) * theColumns) + std::arg(aMean));
  }
  theRangeFrequency = aResult[0];
  theAzimuthFrequency = aResult[1];
  return true;
}

void fdfPhaseDifferences(const std::complex<float> *theLine, const std::complex<float> *thePrevious,
                         int32_t thePixels, std::complex<float> *theRange, float *theRangeAngles,
                         std::complex<float> *theAzimuth, float *theAzimuthAngles) {
  const auto aUnit = [](std::complex<float> z) {
    const float aMagnitude = std::abs(z);
    return aMagnitude > 0.0f ? z / aMagnitude : std::complex<float>();
  };
  for (int32_t j = 0; j < thePixels; ++j) {
    const std::complex<float> u = aUnit(theLine[j]);
    theRange[j] = j > 0 ? u * std::conj(aUnit(theLine[j - 1])) : std::complex<float>();
    theAzimuth[j] = thePrevious != nullptr ? u * std::conj(aUnit(thePrevious[j])) : std::complex<float>();
    theRangeAngles[j] = std::atan2(theRange[j].imag(), theRange[j].real());
    theAzimuthAngles[j] = std::atan2(theAzimuth[j].imag(), theAzimuth[j].real());
  }
}
