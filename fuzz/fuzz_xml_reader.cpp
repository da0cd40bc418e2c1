// XML header reader: the whole file into a description, the list layout of
// single sections, and, after a good read, writing the values back out.
#include "tlrx_description_xml.h"
#include "tlrx_errors.h"
#include "tlrx_fuzz_support.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *theData, size_t theSize) {
  const std::string aInput = tlrxFuzzPath("input.sml");
  tlrxFuzzWrite(aInput, theData, theSize);
  CDescription &aDescription = tlrxFuzzDescription();
  bool aRead = false;
  try {
    aRead = aDescription.readXML(aInput.c_str(), true);
  } catch (const CErrorExceptionManager &) {
  }
  if (aRead) {
    try {
      const std::string aOutput = tlrxFuzzPath("output.sml");
      aDescription.writeXML(aOutput.c_str(), true, true);
      aDescription.readXML(aOutput.c_str(), true);
    } catch (const CErrorExceptionManager &) {
    }
  }
  try {
    fdfReadXMLSection(*aDescription.findSection("Sensor"), aInput.c_str(), true);
  } catch (const CErrorExceptionManager &) {
  }
  return 0;
}
