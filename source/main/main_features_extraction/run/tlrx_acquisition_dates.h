// Acquisition dates of a dated series, shared by the commands that order
// their inputs in time (min and max, temporal features).
#pragma once

#include <string>
#include <vector>

#include "tlrx_time_man_utility.h"

// The "ACQUISITION TIME" of input theName: a missing or unreadable date logs
// which and raises 848642 naming the key.
STLRXDate fdfReadInputDate(const std::string &theName);

// How two dates compare: by day, then by seconds (min and max), or by day
// number alone (temporal features, where a day is the unit of time).
enum class ETLRXDateOrder { kDayThenSeconds, kDayNumber };

// Exchange sort of dates and names together: for i, for j > i, swap when
// date i comes after date j in theOrder. Equal dates are never swapped.
void fdfSortByDate(std::vector<STLRXDate> &theDates, std::vector<std::string> &theNames, ETLRXDateOrder theOrder);

// Reads the acquisition date of every input and sorts names and dates into
// ascending order of day and seconds (min and max).
std::vector<STLRXDate> fdfOrderChronologically(std::vector<std::string> &theNames);
// The same in ascending order of day numbers (temporal features).
std::vector<STLRXDate> fdfOrderByDayNumber(std::vector<std::string> &theNames);
