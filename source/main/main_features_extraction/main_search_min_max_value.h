// Min-and-max command: per pixel the smallest and largest value over a stack
// of dated images and the (chronological) position of the image holding each.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "tlrx_time_man_utility.h"

// Driver of "main_min_and_max#": theArguments names the argument file.
int32_t main_search_min_max_value(const char *theArguments);

// Reads the acquisition date of every input and sorts names and dates into
// ascending date order (equal dates keep their order).
std::vector<STLRXDate> fdfOrderChronologically(std::vector<std::string> &theNames);

// Palette entry of class theClass (1..n) of a date map.
void fdfDateClassColour(int theClass, int &theRed, int &theGreen, int &theBlue);
