// Text-form ("_hdr") reader: every section's block, then a section written
// into the fuzzed file, which must keep or replace its blocks.
#include "tlrx_description_xml.h"
#include "tlrx_errors.h"
#include "tlrx_fuzz_support.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *theData, size_t theSize) {
  const std::string aInput = tlrxFuzzPath("input_hdr");
  tlrxFuzzWrite(aInput, theData, theSize);
  CDescription &aDescription = tlrxFuzzDescription();
  for (int32_t i = 0; i < aDescription.getSectionCount(); ++i) {
    try {
      fdfReadTextSection(*aDescription.getSection(i), aInput.c_str());
    } catch (const CErrorExceptionManager &) {
    }
  }
  try {
    fdfWriteTextSection(*aDescription.findSection("Sensor"), aInput.c_str());
    fdfReadTextSection(*aDescription.findSection("Sensor"), aInput.c_str());
  } catch (const CErrorExceptionManager &) {
  }
  return 0;
}
