// Text forms of the current local time.
#pragma once

#include <string>

// "YYYYMMDDhhmmss", optionally followed by ".uuuuuu".
std::string fdfGetTimeStamp(bool theMicroseconds = false);
// "DD-Mon-YYYY hh:mm:ss.uuuuuu"
std::string fdfGetCalendarTime();
// The 24-character calendar form with its line end ("Sun Dec  6 09:47:00 2026\n").
std::string fdfGetAscTime();
