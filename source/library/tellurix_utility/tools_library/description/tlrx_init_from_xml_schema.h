// XML schema declarations of description sections, and the command
// parameter-file protocol built on them.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "tlrx_description_section.h"

// The value of "TellurixEnvironment" that a parameter file must hold.
constexpr const char *CTLRX_PARAMETER_ENVIRONMENT = "IDL_ENVI_ENV";
// Longest schema line accepted by the loader.
constexpr size_t CTLRX_SCHEMA_MAX_LINE = 40000;

// Shape and value type of a schema type name (-1 when not recognised).
int32_t fdfSchemaShape(const char *theTypeName);
int32_t fdfSchemaValueType(const char *theTypeName);

// One declared field of a section; structs list their members, which share
// one shape and value type.
struct STLRXSchemaField {
  std::string mName;
  int32_t mShape = CTLRX_DS_UNRECOGNISED;
  int32_t mValueType = CTLRX_DS_UNRECOGNISED;
  std::vector<std::string> mMemberNames; // empty for plain fields
  int32_t mMemberShape = CTLRX_DS_UNRECOGNISED;
  int32_t mMemberValueType = CTLRX_DS_UNRECOGNISED;
};

struct STLRXSchemaSection {
  std::string mName;
  std::vector<STLRXSchemaField> mFields;
  // Fields of the built section: structs count their members too.
  int32_t builtFieldCount() const;
};

// A loaded schema: root name and the section declarations in document order.
class CXmlSchema {
public:
  // theRootName nullptr: "HEADER_INFO". theSchemaName: an existing file is
  // used as is, else the schema directory + name + ".xsd" (nullptr: the root
  // name). False for a missing file or root declaration; raises 261121 for a
  // file that cannot be parsed.
  bool load(const char *theRootName, const char *theSchemaName);
  const STLRXSchemaSection *findSection(const char *theName) const;
  const std::vector<STLRXSchemaSection> &getSections() const { return mSections; }
  const std::string &getRootName() const { return mRootName; }
  void release();

private:
  std::string mRootName = CTLRX_DS_DEFAULT_ROOT_TAG;
  std::vector<STLRXSchemaSection> mSections;
};

// Builds theSection from its declaration (name, fields, struct members right
// after their struct). False when the declaration has no fields.
bool fdfBuildSectionFromSchema(const STLRXSchemaSection &theDeclaration, CDescriptionSection &theSection);

// Parameter-file protocol: declare theDescription from schema theSchemaName
// with theSections, read theFile (raises 261121 when it cannot be parsed),
// print it, and check "TellurixEnvironment". False when any step fails.
bool fdfInitParameters(const char *theSchemaName, const std::vector<std::string> &theSections, const char *theFile,
                       CDescription &theDescription);

// The same for a command: a failure is logged and raised as 456960.
void fdfLoadCommandParameters(const char *theSchemaName, const std::vector<std::string> &theSections,
                              const char *theFile, CDescription &theDescription);
