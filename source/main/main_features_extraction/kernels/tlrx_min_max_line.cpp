// Minimum and maximum over a stack, one line at a time, with the position
// in time (1..n) of the input that holds each. A pixel that is no data in
// any input, by the raster rule (tlrx_no_data.h) against that input's null
// value, is no data in every result (value theNull, date 0); strict
// comparisons keep the earlier date on ties.
#include "tlrx_min_max_line.h"

#include "tlrx_no_data.h"

#include <algorithm>
#include <cmath>
#include <cstring>

namespace {

// theCondition ? theYes : theNo on the bits, which the compiler vectorises
// where a floating-point selection would stay a branch.
inline float fdfSelect(bool theCondition, float theYes, float theNo) {
  uint32_t aYes, aNo;
  std::memcpy(&aYes, &theYes, sizeof aYes);
  std::memcpy(&aNo, &theNo, sizeof aNo);
  const uint32_t aMask = 0u - static_cast<uint32_t>(theCondition);
  const uint32_t aBits = (aYes & aMask) | (aNo & ~aMask);
  float aResult;
  std::memcpy(&aResult, &aBits, sizeof aResult);
  return aResult;
}

// Validity of one input line against its null value. Min and max keep the
// rule as it is: a NaN value with a numeric null is a value (the strict
// comparisons never select a later NaN; a first one stays).
void fdfValidCells(const float *__restrict theRow, double theNull, int32_t thePixels, uint8_t *__restrict theValid) {
  const SNoData aNoData(theNull);
  for (int32_t x = 0; x < thePixels; ++x)
    theValid[x] &= !aNoData.isNull(theRow[x]);
}

} // namespace

// Input by input over the whole line, so each loop vectorises; a pixel that
// is no data in any input ends as theNull with date 0, as if the visit had
// stopped at that input. Strict comparisons keep the earlier date on ties.
void fdfMinMaxLine(const std::vector<const float *> &theRows, const std::vector<double> &theNulls,
                   int32_t thePixels, float theNull, std::vector<uint8_t> &theValid, const SMinMax &theOut) {
  std::fill(theValid.begin(), theValid.end(), 1);
  const float *aFirst = theRows[0];
  for (int32_t x = 0; x < thePixels; ++x) {
    theOut.mMin[x] = theOut.mMax[x] = aFirst[x];
    theOut.mMinDate[x] = theOut.mMaxDate[x] = 1.0f;
  }
  fdfValidCells(aFirst, theNulls[0], thePixels, theValid.data());
  for (size_t i = 1; i < theRows.size(); ++i) {
    const float *__restrict aRow = theRows[i];
    float *__restrict aMin = theOut.mMin;
    float *__restrict aMax = theOut.mMax;
    float *__restrict aMinDate = theOut.mMinDate;
    float *__restrict aMaxDate = theOut.mMaxDate;
    const float aDate = static_cast<float>(i + 1);
    for (int32_t x = 0; x < thePixels; ++x) {
      const float aValue = aRow[x];
      const bool aLower = aValue < aMin[x];
      const bool aHigher = aValue > aMax[x];
      aMin[x] = fdfSelect(aLower, aValue, aMin[x]);
      aMinDate[x] = fdfSelect(aLower, aDate, aMinDate[x]);
      aMax[x] = fdfSelect(aHigher, aValue, aMax[x]);
      aMaxDate[x] = fdfSelect(aHigher, aDate, aMaxDate[x]);
    }
    fdfValidCells(aRow, theNulls[i], thePixels, theValid.data());
  }
  for (int32_t x = 0; x < thePixels; ++x) {
    const bool aValid = theValid[x] != 0;
    theOut.mMin[x] = aValid ? theOut.mMin[x] : theNull;
    theOut.mMax[x] = aValid ? theOut.mMax[x] : theNull;
    theOut.mMinDate[x] = aValid ? theOut.mMinDate[x] : 0.0f;
    theOut.mMaxDate[x] = aValid ? theOut.mMaxDate[x] : 0.0f;
  }
}

