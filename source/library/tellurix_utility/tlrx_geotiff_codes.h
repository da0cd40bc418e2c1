// Numbered errors of the GeoTIFF quick-looks, shared by the conversion and
// the file it writes.
#pragma once

#include <cstdint>

// Codes raised by the conversion (primary class 2, raster and quick-look output).
constexpr int32_t CTLRX_ERR_TIFF_ARGUMENTS = 130560;     // 2, -1 argument vector without raster and TIFF names
constexpr int32_t CTLRX_ERR_TIFF_HEADER_MISSING = 130562; // 2, 1 input header cannot be read
constexpr int32_t CTLRX_ERR_TIFF_RASTER_OPEN = 130563;   // 2, 2 input raster cannot be opened
constexpr int32_t CTLRX_ERR_TIFF_EMPTY_SAMPLE = 130564;  // 2, 3 no valid value in the statistics sample
constexpr int32_t CTLRX_ERR_TIFF_CREATE = 130565;        // 2, 4 TIFF cannot be created, written or renamed
constexpr int32_t CTLRX_ERR_TIFF_HEADER_WRITE = 130566;  // 2, 5 TIFF header cannot be written
constexpr int32_t CTLRX_ERR_TIFF_HISTOGRAM = 130567;     // 2, 6 histogram of the sample cannot be built
