// Calendar arithmetic of the simulator (proleptic Gregorian, days counted
// from 1 January 1970).
#include "tlrx_sim_dates.h"

#include <cstdio>
#include <cstdlib>

namespace {

const char *const sMonthNames[12] = {"JAN", "FEB", "MAR", "APR", "MAY", "JUN",
                                       "JUL", "AUG", "SEP", "OCT", "NOV", "DEC"};

int64_t daysFromCivil(int64_t theYear, int theMonth, int theDay) {
  const int64_t aYear = theYear - (theMonth <= 2 ? 1 : 0);
  const int64_t aEra = (aYear >= 0 ? aYear : aYear - 399) / 400;
  const int64_t aYearOfEra = aYear - aEra * 400;
  const int64_t aDayOfYear = (153 * (theMonth + (theMonth > 2 ? -3 : 9)) + 2) / 5 + theDay - 1;
  const int64_t aDayOfEra = aYearOfEra * 365 + aYearOfEra / 4 - aYearOfEra / 100 + aDayOfYear;
  return aEra * 146097 + aDayOfEra - 719468;
}

void civilFromDays(int64_t theDays, int &theYear, int &theMonth, int &theDay) {
  const int64_t aZ = theDays + 719468;
  const int64_t aEra = (aZ >= 0 ? aZ : aZ - 146096) / 146097;
  const int64_t aDayOfEra = aZ - aEra * 146097;
  const int64_t aYearOfEra = (aDayOfEra - aDayOfEra / 1460 + aDayOfEra / 36524 - aDayOfEra / 146096) / 365;
  const int64_t aDayOfYear = aDayOfEra - (365 * aYearOfEra + aYearOfEra / 4 - aYearOfEra / 100);
  const int64_t aMonthIndex = (5 * aDayOfYear + 2) / 153;
  theDay = static_cast<int>(aDayOfYear - (153 * aMonthIndex + 2) / 5 + 1);
  theMonth = static_cast<int>(aMonthIndex < 10 ? aMonthIndex + 3 : aMonthIndex - 9);
  theYear = static_cast<int>(aYearOfEra + aEra * 400 + (theMonth <= 2 ? 1 : 0));
}

int daysInMonth(int theYear, int theMonth) {
  static const int aDays[12] = {31, 28, 31, 30, 31, 30, 31, 31, 30, 31, 30, 31};
  const bool aLeap = (theYear % 4 == 0 && theYear % 100 != 0) || theYear % 400 == 0;
  return theMonth == 2 && aLeap ? 29 : aDays[theMonth - 1];
}

// Reads exactly theDigits decimal digits at thePos.
bool readDigits(const std::string &theText, size_t &thePos, int theDigits, int &theValue) {
  theValue = 0;
  for (int i = 0; i < theDigits; ++i, ++thePos) {
    if (thePos >= theText.size() || theText[thePos] < '0' || theText[thePos] > '9')
      return false;
    theValue = theValue * 10 + (theText[thePos] - '0');
  }
  return true;
}

bool expect(const std::string &theText, size_t &thePos, char theChar) {
  if (thePos >= theText.size() || theText[thePos] != theChar)
    return false;
  ++thePos;
  return true;
}

// "hh:mm[:ss[.ffffff]]" from thePos to the end, into microseconds of the day.
bool readTimeOfDay(const std::string &theText, size_t thePos, int64_t &theMicros) {
  int aHours = 0, aMinutes = 0, aSeconds = 0;
  if (!readDigits(theText, thePos, 2, aHours) || !expect(theText, thePos, ':') ||
      !readDigits(theText, thePos, 2, aMinutes))
    return false;
  int64_t aFraction = 0;
  if (thePos < theText.size()) {
    if (!expect(theText, thePos, ':') || !readDigits(theText, thePos, 2, aSeconds))
      return false;
    if (thePos < theText.size()) {
      if (!expect(theText, thePos, '.') || thePos >= theText.size())
        return false;
      int64_t aScale = 100000;
      for (; thePos < theText.size(); ++thePos, aScale /= 10) {
        if (aScale == 0 || theText[thePos] < '0' || theText[thePos] > '9')
          return false;
        aFraction += (theText[thePos] - '0') * aScale;
      }
    }
  }
  if (aHours > 23 || aMinutes > 59 || aSeconds > 59)
    return false;
  theMicros = ((aHours * 60LL + aMinutes) * 60LL + aSeconds) * 1000000LL + aFraction;
  return true;
}

} // namespace

bool fdfSimParseIsoDate(const std::string &theText, int64_t &theMicros, std::string &theError) {
  size_t aPos = 0;
  int aYear = 0, aMonth = 0, aDay = 0;
  if (!readDigits(theText, aPos, 4, aYear) || !expect(theText, aPos, '-') || !readDigits(theText, aPos, 2, aMonth) ||
      !expect(theText, aPos, '-') || !readDigits(theText, aPos, 2, aDay)) {
    theError = "expected YYYY-MM-DD[Thh:mm[:ss[.ffffff]]]";
    return false;
  }
  if (aMonth < 1 || aMonth > 12 || aDay < 1 || aDay > daysInMonth(aYear, aMonth)) {
    theError = "no such calendar date";
    return false;
  }
  int64_t aTime = 0;
  if (aPos < theText.size()) {
    if ((theText[aPos] != 'T' && theText[aPos] != ' ') || !readTimeOfDay(theText, aPos + 1, aTime)) {
      theError = "expected YYYY-MM-DD[Thh:mm[:ss[.ffffff]]]";
      return false;
    }
  }
  theMicros = daysFromCivil(aYear, aMonth, aDay) * CTLRX_SIM_MICROS_PER_DAY + aTime;
  if (!fdfSimDateInRange(theMicros)) {
    theError = "the year must lie in 1970..2100";
    return false;
  }
  return true;
}

bool fdfSimDateInRange(int64_t theMicros) {
  return theMicros >= daysFromCivil(CTLRX_SIM_FIRST_YEAR, 1, 1) * CTLRX_SIM_MICROS_PER_DAY &&
         theMicros < daysFromCivil(CTLRX_SIM_LAST_YEAR + 1, 1, 1) * CTLRX_SIM_MICROS_PER_DAY;
}

std::string fdfSimAcquisitionText(int64_t theMicros) {
  const int64_t aDays = theMicros / CTLRX_SIM_MICROS_PER_DAY;
  int64_t aRest = theMicros % CTLRX_SIM_MICROS_PER_DAY;
  int aYear = 0, aMonth = 0, aDay = 0;
  civilFromDays(aDays, aYear, aMonth, aDay);
  const int aMicros = static_cast<int>(aRest % 1000000);
  aRest /= 1000000;
  char aText[64];
  std::snprintf(aText, sizeof aText, "%02d-%s-%04d %02d:%02d:%02d.%06d", aDay, sMonthNames[aMonth - 1], aYear,
                static_cast<int>(aRest / 3600), static_cast<int>(aRest / 60 % 60), static_cast<int>(aRest % 60),
                aMicros);
  return aText;
}
