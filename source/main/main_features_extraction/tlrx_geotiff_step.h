// The GeoTIFF quick-look as the commands use it: a step program for the
// step runner and a direct call with the commands' standard arguments.
#pragma once

#include <string>

int fdfGeoTiffStep(int theArgc, char **theArgv);
void fdfMakeQuickLook(const std::string &theRaster, double theSaturation);
