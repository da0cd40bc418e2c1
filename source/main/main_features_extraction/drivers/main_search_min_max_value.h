// Min-and-max command: per pixel the smallest and largest value over a stack
// of dated images and the (chronological) position of the image holding each.
#pragma once

#include <cstdint>

// Driver of "main_min_and_max#": theArguments names the argument file.
int32_t main_search_min_max_value(const char *theArguments);

// Palette entry of class theClass (1..n) of a date map.
void fdfDateClassColour(int theClass, int &theRed, int &theGreen, int &theBlue);
