// Text forms of the current local time.
#include "tlrx_time_man_utility.h"

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
  static const char *const theMonths[12] = {"Jan", "Feb", "Mar", "Apr", "May", "Jun",
                                            "Jul", "Aug", "Sep", "Oct", "Nov", "Dec"};
  const STLRXNow aNow = fdfNow();
  char aText[64];
  std::snprintf(aText, sizeof aText, "%02d-%3.3s-%04d %02d:%02d:%02d.%06ld", aNow.mTime.tm_mday,
                theMonths[aNow.mTime.tm_mon], aNow.mTime.tm_year + 1900, aNow.mTime.tm_hour, aNow.mTime.tm_min,
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
