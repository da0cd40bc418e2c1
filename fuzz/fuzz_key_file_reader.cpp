// Key-file reader of the description model: any section, then a named one.
#include "tlrx_description_section.h"
#include "tlrx_errors.h"
#include "tlrx_fuzz_support.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *theData, size_t theSize) {
  const std::string aInput = tlrxFuzzPath("input.key");
  tlrxFuzzWrite(aInput, theData, theSize);
  for (const char *aName : {static_cast<const char *>(nullptr), "Sensor"}) {
    try {
      CDescriptionSection aSection;
      if (aSection.declareFromKeyFile(aInput.c_str(), aName)) {
        // Exercise the declared fields: structs sized, values cleared.
        for (int32_t i = 0; i < aSection.getFieldCount(); ++i)
          aSection.getField(i)->holdsValue();
        aSection.clearValues();
      }
    } catch (const CErrorExceptionManager &) {
    }
  }
  return 0;
}
