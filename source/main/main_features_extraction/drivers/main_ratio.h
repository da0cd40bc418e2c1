// Ratio command: ratio images of consecutive acquisitions of a list.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

// Driver of "main_ratio#": theArguments names the argument file.
int32_t main_ratio(const char *theArguments);

// Output name of pair thePair from root theRoot for a list of theFiles files.
std::string fdfRatioPairName(const std::string &theRoot, int thePair, size_t theFiles);
// Step plan: ratio (0) and, with theTiff, GeoTIFF (1) for each consecutive pair.
std::vector<int> fdfRatioPlan(size_t theFiles, bool theTiff);
