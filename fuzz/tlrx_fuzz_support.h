// Shared by the fuzz targets: throw mode, scratch files, and a description
// declaring every shape and value type for the readers to fill.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

#include "tlrx_description_section.h"

extern "C" int LLVMFuzzerInitialize(int *theArgc, char ***theArgv);
extern "C" int LLVMFuzzerTestOneInput(const uint8_t *theData, size_t theSize);

// A file of this process in a scratch folder (tmpfs when there is one).
std::string tlrxFuzzPath(const char *theName);
// Writes the input to thePath.
void tlrxFuzzWrite(const std::string &thePath, const uint8_t *theData, size_t theSize);
// Sections "Sensor" and "RasterInfo" with scalars, vectors, matrices and
// structs of every value type (declared once, values cleared on each call).
CDescription &tlrxFuzzDescription();
