// Acquisition dates of simulated images: read from ISO texts given on the
// command line, advanced by intervals, and written in the header form
// "DD-MMM-YYYY hh:mm:ss.ffffff" that the commands parse.
#pragma once

#include <cstdint>
#include <string>

// Years the commands accept in an acquisition date.
constexpr int CTLRX_SIM_FIRST_YEAR = 1970;
constexpr int CTLRX_SIM_LAST_YEAR = 2100;
constexpr int64_t CTLRX_SIM_MICROS_PER_DAY = 86400000000LL;

// "YYYY-MM-DD", optionally followed by "T" or a blank and "hh:mm[:ss[.ffffff]]",
// into microseconds since 1 January 1970. False (theError says why) for a
// malformed text, an impossible calendar date or a year outside 1970..2100.
bool fdfSimParseIsoDate(const std::string &theText, int64_t &theMicros, std::string &theError);
// Whether a time in microseconds lies within the accepted years.
bool fdfSimDateInRange(int64_t theMicros);
// "DD-MMM-YYYY hh:mm:ss.ffffff", for example "05-MAR-2004 09:30:15.500000".
std::string fdfSimAcquisitionText(int64_t theMicros);
