// Standard header description: the 21 sections every raster header is read
// into and written from, declared from their key files.
#pragma once

#include <string>
#include <vector>

#include "tlrx_description_section.h"

// The section names, in declaration order.
const std::vector<std::string> &fdfStandardHeaderSections();

// Clears theDescription and declares the standard header sections.
void fdfDeclareStandardHeader(CDescription &theDescription);

// Declares the standard header and reads the header of raster theName (theName
// itself when it ends in "_orb_hdr", "_hdr" or "_orb.sml", else theName +
// "_hdr", its ".sml" form first). Raises 261122 with the name when it cannot
// be read.
void fdfReadStandardHeader(const char *theName, CDescription &theDescription);

// Writes the header of raster theName (XML form, then the ENVI header).
// With theRaise a failure traces "Error while writing parameter file" and
// raises 261124; otherwise the result reports it.
bool fdfWriteStandardHeader(const char *theName, CDescription &theDescription, bool theRaise = false);
