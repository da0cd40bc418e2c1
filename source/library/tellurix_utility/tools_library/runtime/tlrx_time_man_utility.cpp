// Text forms of the current local time.
#include "tlrx_time_man_utility.h"

#include <cmath>
#include <cstdio>
#include <ctime>
#include <sys/time.h>

namespace {

struct STLRXNow {
  struct tm mTime;
  long mMicroseconds;
};

STLRXNow fdfNow() {
  struct timeval aNow;
  gettimeofday(&aNow, nullptr);
  STLRXNow aResult;
  time_t aSeconds = aNow.tv_sec;
  localtime_r(&aSeconds, &aResult.mTime);
  aResult.mMicroseconds = static_cast<long>(aNow.tv_usec);
  return aResult;
}

} // namespace

std::string fdfGetTimeStamp(bool theMicroseconds) {
  const STLRXNow aNow = fdfNow();
  char aText[40];
  int aLen = std::snprintf(aText, sizeof aText, "%04d%02d%02d%02d%02d%02d", aNow.mTime.tm_year + 1900,
                           aNow.mTime.tm_mon + 1, aNow.mTime.tm_mday, aNow.mTime.tm_hour, aNow.mTime.tm_min,
                           aNow.mTime.tm_sec);
  if (theMicroseconds)
    std::snprintf(aText + aLen, sizeof aText - aLen, ".%06ld", aNow.mMicroseconds);
  return aText;
}

std::string fdfGetCalendarTime() {
  static const char *const aMonths[12] = {"Jan", "Feb", "Mar", "Apr", "May", "Jun",
                                            "Jul", "Aug", "Sep", "Oct", "Nov", "Dec"};
  const STLRXNow aNow = fdfNow();
  char aText[64];
  std::snprintf(aText, sizeof aText, "%02d-%3.3s-%04d %02d:%02d:%02d.%06ld", aNow.mTime.tm_mday,
                aMonths[aNow.mTime.tm_mon], aNow.mTime.tm_year + 1900, aNow.mTime.tm_hour, aNow.mTime.tm_min,
                aNow.mTime.tm_sec, aNow.mMicroseconds);
  return aText;
}

std::string fdfGetAscTime() {
  const STLRXNow aNow = fdfNow();
  char aText[64];
  if (std::strftime(aText, sizeof aText, "%a %b %e %H:%M:%S %Y\n", &aNow.mTime) == 0)
    return "\n";
  return aText;
}

namespace {

// Days since 1970-01-01 of a civil date (proleptic Gregorian calendar).
long fdfDaysFromCivil(int theYear, int theMonth, int theDay) {
  theYear -= theMonth <= 2;
  const long aEra = (theYear >= 0 ? theYear : theYear - 399) / 400;
  const long aYearOfEra = theYear - aEra * 400;
  const long aDayOfYear = (153 * (theMonth + (theMonth > 2 ? -3 : 9)) + 2) / 5 + theDay - 1;
  const long aDayOfEra = aYearOfEra * 365 + aYearOfEra / 4 - aYearOfEra / 100 + aDayOfYear;
  return aEra * 146097 + aDayOfEra - 719468;
}

// Digits at [theFrom, theFrom + theCount); blanks count as zeros.
bool fdfReadDigits(const std::string &theText, size_t theFrom, size_t theCount, int &theValue) {
  theValue = 0;
  for (size_t i = theFrom; i < theFrom + theCount; ++i) {
    const char aChar = i < theText.size() ? theText[i] : ' ';
    if (aChar == ' ')
      theValue *= 10;
    else if (aChar >= '0' && aChar <= '9')
      theValue = theValue * 10 + (aChar - '0');
    else
      return false;
  }
  return true;
}

int fdfDaysInMonth(int theYear, int theMonth) {
  static const int aDays[12] = {31, 28, 31, 30, 31, 30, 31, 31, 30, 31, 30, 31};
  const bool aLeap = (theYear % 4 == 0 && theYear % 100 != 0) || theYear % 400 == 0;
  return theMonth == 2 && aLeap ? 29 : aDays[theMonth - 1];
}

} // namespace

bool fdfParseAcquisitionDate(const std::string &theInput, STLRXDate &theDate) {
  static const char *const aMonths[12] = {"JAN", "FEB", "MAR", "APR", "MAY", "JUN",
                                            "JUL", "AUG", "SEP", "OCT", "NOV", "DEC"};
  const std::string aText = theInput.size() > 1 && theInput[1] == '-' ? " " + theInput : theInput;
  if (aText.size() < 11 || aText[2] != '-' || aText[6] != '-')
    return false;
  int aMonth = 0;
  for (int i = 0; i < 12 && aMonth == 0; ++i)
    if (aText.compare(3, 3, aMonths[i]) == 0)
      aMonth = i + 1;
  int aDay, aYear, aHours = 0, aMinutes = 0, aSeconds = 0;
  if (aMonth == 0 || aText[1] == ' ' || !fdfReadDigits(aText, 0, 2, aDay) || !fdfReadDigits(aText, 7, 4, aYear) ||
      !fdfReadDigits(aText, 12, 2, aHours) || !fdfReadDigits(aText, 15, 2, aMinutes) ||
      !fdfReadDigits(aText, 18, 2, aSeconds))
    return false;
  if (aYear < 1970 || aYear > 2100 || aDay < 1 || aDay > fdfDaysInMonth(aYear, aMonth) || aHours > 23 ||
      aMinutes > 59 || aSeconds > 60)
    return false;
  double aFraction = 0.0, aScale = 0.1;
  for (size_t i = 21; i < aText.size() && i < 27 && aText[i] >= '0' && aText[i] <= '9'; ++i, aScale /= 10)
    aFraction += (aText[i] - '0') * aScale;
  theDate.mYear = aYear;
  theDate.mMonth = aMonth;
  theDate.mDayOfMonth = aDay;
  theDate.mDay = fdfDaysFromCivil(aYear, aMonth, aDay);
  theDate.mSeconds = aHours * 3600.0 + aMinutes * 60.0 + aSeconds + aFraction;
  return true;
}

bool fdfDateBefore(const STLRXDate &theFirst, const STLRXDate &theSecond) {
  if (theFirst.mDay != theSecond.mDay)
    return theFirst.mDay < theSecond.mDay;
  if (std::fabs(theFirst.mSeconds - theSecond.mSeconds) <= 1.1754943508222875e-38)
    return false;
  return theFirst.mSeconds < theSecond.mSeconds;
}

namespace {

std::string fdfFormatDate(const STLRXDate &theDate, bool theFraction) {
  const double aSeconds = theDate.mSeconds > 0 ? theDate.mSeconds : 0.0;
  const int aHours = static_cast<int>(aSeconds / 3600);
  const int aMinutes = static_cast<int>((aSeconds - 3600.0 * aHours) / 60);
  const double aRest = aSeconds - 3600.0 * aHours - 60.0 * aMinutes;
  char aText[64];
  if (theFraction)
    std::snprintf(aText, sizeof aText, "%04d-%02d-%02d %02d:%02d:%09.6f", theDate.mYear, theDate.mMonth,
                  theDate.mDayOfMonth, aHours, aMinutes, aRest);
  else
    std::snprintf(aText, sizeof aText, "%04d-%02d-%02d %02d:%02d:%02d", theDate.mYear, theDate.mMonth,
                  theDate.mDayOfMonth, aHours, aMinutes, static_cast<int>(aRest));
  return aText;
}

} // namespace

std::string fdfDateText(const STLRXDate &theDate) { return fdfFormatDate(theDate, false); }
std::string fdfDateTraceText(const STLRXDate &theDate) { return fdfFormatDate(theDate, true); }
