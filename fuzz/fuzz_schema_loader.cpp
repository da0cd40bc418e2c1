// Schema loader: any schema text, then a description declared from it.
#include "tlrx_description_section.h"
#include "tlrx_errors.h"
#include "tlrx_fuzz_support.h"
#include "tlrx_init_from_xml_schema.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *theData, size_t theSize) {
  const std::string aInput = tlrxFuzzPath("input.xsd");
  tlrxFuzzWrite(aInput, theData, theSize);
  try {
    CXmlSchema aSchema;
    if (!aSchema.load(nullptr, aInput.c_str()))
      return 0;
    std::vector<std::string> aNames;
    for (const STLRXSchemaSection &aSection : aSchema.getSections())
      aNames.push_back(aSection.mName);
    CDescription aDescription;
    if (aDescription.declareFromSchema(aInput.c_str(), aNames)) {
      // Exercise the declared fields: structs sized, values cleared.
      for (int32_t s = 0; s < aDescription.getSectionCount(); ++s)
        for (int32_t f = 0; f < aDescription.getSection(s)->getFieldCount(); ++f) {
          CDescriptionField &aField = *aDescription.getSection(s)->getField(f);
          if (aField.getShape() == CTLRX_DS_MULTIPLE)
            aField.setNumberOfElements(2);
          aField.holdsValue();
        }
      aDescription.clearValues();
    }
  } catch (const CErrorExceptionManager &) {
  }
  return 0;
}
