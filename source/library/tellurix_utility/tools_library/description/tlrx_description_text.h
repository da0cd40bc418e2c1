// Older line-oriented text form of descriptions ("_hdr" files):
//
//   [RasterInfo]
//   NrOfLinesPerImage=512
//   CellType="FLOAT"
//   Doppler={0.5 -1.25e-05 NaN}
//   OtherInfo={{"SOFTWARE" "Tellurix"} {"DATE" ""}}
//
// Scalars hold their value, vectors "{" the elements "}", matrices one
// "{...}" group per row, structs of vectors one group per element (member
// values in member order) and structs of scalars their member values.
// Strings are in double quotes ("" for an element never set), doubles are
// written with the fewest digits that read back to the same value.
#pragma once

#include <cstddef>

#include "tlrx_description_section.h"

constexpr size_t CTLRX_TEXT_FORM_MAX_LINE = 1000000;

// Reads the block of theSection from theFile; false when the file cannot be
// read, has no block of that name or holds an over-long line in it. Lines of
// fields the section does not declare are skipped. Raises 848642 for a field
// line without (complete) value, 848644 for a field of unusable shape or
// value type.
bool fdfReadTextSection(CDescriptionSection &theSection, const char *theFile);

// Rewrites theFile with its other blocks kept byte for byte and this
// section's block in its place (appended when new); false when a field has
// no text form or the file cannot be written.
bool fdfWriteTextSection(const CDescriptionSection &theSection, const char *theFile);
