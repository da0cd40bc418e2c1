// ENVI header files: the ".hdr" companion written beside every raster whose
// header is written, so the raster opens directly in ENVI and in GDAL's ENVI
// driver. The key words, data-type codes, interleave and byte-order values
// come from a vocabulary file ("ENVI_descriptions_<profile>.des"), the values
// from the raster's own header description.
//
// A raster that ENVI cannot describe (signed 8-bit or packed-bit cells, row
// prefixes or suffixes, a header offset without a key word for it) gets no
// ENVI header: a file that readers would silently misread is worse than none.
#pragma once

#include <cstdint>
#include <string>
#include "tlrx_error_codes.h"

class CDescription;

// Codes raised here (261122 and 913920 are the runtime's CTLRX_ERR_FILE_OPEN
// and CTLRX_ERR_UNEXPECTED).

// Vocabulary: the section its key file declares, and the profile used when
// the caller names none.
constexpr const char *CTLRX_ENVI_SECTION = "ENVI_HeaderDescriptionType";
constexpr const char *CTLRX_ENVI_DEFAULT_PROFILE = "default";
// Last line of the description block when acquisition times are listed.
constexpr const char *CTLRX_ENVI_GENERATED_TEXT = "File generated with Tellurix  4.3.000}";

// ENVI header name of a raster or header name: a trailing "_hdr" (or ".sml")
// removed, ".hdr" appended.
std::string fdfEnviHeaderFileName(const std::string &theName);
// Names that get no ENVI header: GeoTIFF exports, orbit files and parameter
// files (suffixes compared ignoring case).
bool fdfIsEnviHeaderExcluded(const std::string &theName);
// Vocabulary file of a profile (nullptr or "" for the default profile) in the
// directory of the setting TELLURIX_CEOS_DES_FILES_DIR (783360 when missing).
std::string fdfEnviVocabularyFileName(const char *theProfile);

// Doubles of ENVI headers: 30 significant digits, "NaN" for not-a-number.
std::string fdfEnviDouble(double theValue);

// Header lookups of the ENVI lines (also used by the map lines): the number
// of a scalar field that holds one, read by the header accessors (false when
// it holds none; a text that is not a number raises 848642 naming it), and
// the text of a scalar string field that holds one (nullptr otherwise).
bool fdfEnviFieldNumber(const CDescription &theHeader, const char *theKey, double &theValue);
const char *fdfEnviFieldText(const CDescription &theHeader, const char *theKey);

// Writes the ENVI header of raster (or header) theName from the header just
// written for it: excluded names are skipped with a trace; a header that
// cannot be read raises 261122 (quietly skipped when the name contains
// ".shp"); a failed write raises 261121; any other exception is reported as
// 913920.
void fdfWriteRasterHeaderEnvi(const char *theName, const char *theProfile = nullptr);

// The writer proper: the ENVI header of theHeader into theEnviFile. Returns
// true when the file was written, false for a documented skip (no
// "RasterInfo.RowPrefix", no vocabulary file, a layout ENVI cannot describe;
// each traced). Raises 261121, naming the file and the reason, for a header
// or vocabulary that lacks what a line needs and when the file cannot be
// written.
bool fdfWriteEnviHeaderFromDescription(const CDescription &theHeader, const char *theEnviFile,
                                       const char *theProfile = nullptr);

// The writer in the form of the header-write hook of the description files
// (default profile), and its installation there.
void fdfEnviHeaderWriter(const char *theName);
void fdfInstallEnviHeaderWriter();
