// Text forms of the current local time.
#pragma once

#include <string>

// "YYYYMMDDhhmmss", optionally followed by ".uuuuuu".
std::string fdfGetTimeStamp(bool theMicroseconds = false);
// "DD-Mon-YYYY hh:mm:ss.uuuuuu"
std::string fdfGetCalendarTime();
// The 24-character calendar form with its line end ("Sun Dec  6 09:47:00 2026\n").
std::string fdfGetAscTime();

// An acquisition date: day number and seconds of the day.
struct STLRXDate {
  long mDay = 0;         // days since 1 January 1970
  double mSeconds = 0.0; // seconds of the day, fraction included
  int mYear = 0, mMonth = 0, mDayOfMonth = 0;
};

// Parses "DD-MMM-YYYY hh:mm:ss.ffffff" (a one-digit day and blanks in the
// digits read as zeros); false for a month outside "JAN".."DEC", a year
// outside 1970..2100 or a malformed text.
bool fdfParseAcquisitionDate(const std::string &theText, STLRXDate &theDate);
// Day first; seconds equal within the smallest normal float.
bool fdfDateBefore(const STLRXDate &theFirst, const STLRXDate &theSecond);
// "YYYY-MM-DD hh:mm:ss" (class names of date maps).
std::string fdfDateText(const STLRXDate &theDate);
// The same with the fraction of the second, for traces.
std::string fdfDateTraceText(const STLRXDate &theDate);
