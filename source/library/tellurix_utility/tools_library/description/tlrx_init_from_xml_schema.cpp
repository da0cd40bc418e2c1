// XML schema declarations of description sections, and the parameter-file
// protocol of the commands that read XML parameter files.
//
// Only the subset of XML Schema that the product's schemas use is read:
//   root xs:element > xs:complexType > xs:sequence > section xs:element
//   section xs:element > xs:complexType > xs:sequence > field xs:element
// A field is typed by its "type" attribute, or by the "base" of an
// xs:restriction (else xs:extension) inside it; a field whose content is a
// single "VectorOfStructs_" or "Struct_" element is a struct whose members
// are the typed xs:element declarations inside that element.
#include "tlrx_init_from_xml_schema.h"

#include <cstring>

#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"
#include "tlrx_xml_element_tree.h"

namespace {

constexpr const char *CTLRX_XS_ELEMENT = "xs:element";
constexpr const char *CTLRX_SCHEMA_DIR_SETTING = "TELLURIX_XML_SCHEMA_DES_FILES_DIR";
constexpr const char *CTLRX_VECTOR_OF_STRUCTS_PREFIX = "VectorOfStructs_";
constexpr const char *CTLRX_STRUCT_PREFIX = "Struct_";

struct STypeRule {
  const char *mWord;
  int32_t mCode;
};

// First matching substring wins, in table order.
const STypeRule CTLRX_SHAPE_RULES[] = {
    {"xs:anyType", CTLRX_DS_MULTIPLE},     {"xs:", CTLRX_DS_SCALAR},
    {"TellurixFlagType", CTLRX_DS_SCALAR}, {"TellurixInterpolationType", CTLRX_DS_SCALAR},
    {"Vector", CTLRX_DS_VECTOR},           {"Matrix", CTLRX_DS_MATRIX},
};
const STypeRule CTLRX_VALUE_TYPE_RULES[] = {
    {"xs:double", CTLRX_DS_DOUBLE},        {"xs:long", CTLRX_DS_INTEGER},
    {"xs:string", CTLRX_DS_STRING},        {"Double", CTLRX_DS_DOUBLE},
    {"Integer", CTLRX_DS_INTEGER},         {"String", CTLRX_DS_STRING},
    {"TellurixFlagType", CTLRX_DS_STRING}, {"TellurixInterpolationType", CTLRX_DS_STRING},
};

template <size_t N> int32_t applyRules(const STypeRule (&theRules)[N], const char *theTypeName) {
  if (theTypeName == nullptr) {
    return CTLRX_DS_UNRECOGNISED;
  }
  for (const STypeRule &aRule : theRules) {
    if (std::strstr(theTypeName, aRule.mWord) != nullptr) {
      return aRule.mCode;
    }
  }
  return CTLRX_DS_UNRECOGNISED;
}

bool isNamed(const CXmlElement &theElement, const char *theName) { return theElement.getName() == theName; }

bool startsWith(const char *theText, const char *thePrefix) {
  return theText != nullptr && std::strncmp(theText, thePrefix, std::strlen(thePrefix)) == 0;
}

// Visits the descendants of theParent in document order; theVisit returns
// whether to descend into the element it was given. An explicit stack keeps
// deeply nested files from exhausting the call stack.
template <class TVisit> void walkDescendants(const CXmlElement &theParent, TVisit theVisit) {
  std::vector<const CXmlElement *> aStack(theParent.getChildren().rbegin(), theParent.getChildren().rend());
  while (!aStack.empty()) {
    const CXmlElement *aElement = aStack.back();
    aStack.pop_back();
    if (theVisit(*aElement)) {
      aStack.insert(aStack.end(), aElement->getChildren().rbegin(), aElement->getChildren().rend());
    }
  }
}

// The xs:element declarations directly inside theParent: reached through
// xs:complexType, xs:sequence, xs:all and xs:choice, never through another
// xs:element.
std::vector<const CXmlElement *> declarationsIn(const CXmlElement &theParent) {
  std::vector<const CXmlElement *> aResult;
  walkDescendants(theParent, [&aResult](const CXmlElement &theElement) {
    if (isNamed(theElement, CTLRX_XS_ELEMENT)) {
      aResult.push_back(&theElement);
      return false;
    }
    return isNamed(theElement, "xs:complexType") || isNamed(theElement, "xs:sequence") ||
           isNamed(theElement, "xs:all") || isNamed(theElement, "xs:choice");
  });
  return aResult;
}

// First descendant of theParent with the given name, in document order.
const CXmlElement *firstDescendant(const CXmlElement &theParent, const char *theName) {
  const CXmlElement *aFound = nullptr;
  walkDescendants(theParent, [&aFound, theName](const CXmlElement &theElement) {
    if (aFound == nullptr && isNamed(theElement, theName)) {
      aFound = &theElement;
    }
    return aFound == nullptr;
  });
  return aFound;
}

// Typed xs:element declarations anywhere inside theParent, in document order.
std::vector<const CXmlElement *> typedMembersIn(const CXmlElement &theParent) {
  std::vector<const CXmlElement *> aResult;
  walkDescendants(theParent, [&aResult](const CXmlElement &theElement) {
    if (isNamed(theElement, CTLRX_XS_ELEMENT) && theElement.getAttribute("name") != nullptr &&
        theElement.getAttribute("type") != nullptr) {
      aResult.push_back(&theElement);
      return false;
    }
    return true;
  });
  return aResult;
}

// A struct's wrapper: the single declaration inside theField, when it is
// named with one of the struct prefixes.
const CXmlElement *structWrapper(const CXmlElement &theField, bool &theIsVector) {
  const std::vector<const CXmlElement *> aInner = declarationsIn(theField);
  if (aInner.size() != 1) {
    return nullptr;
  }
  const char *aName = aInner[0]->getAttribute("name");
  if (startsWith(aName, CTLRX_VECTOR_OF_STRUCTS_PREFIX)) {
    theIsVector = true;
    return aInner[0];
  }
  if (startsWith(aName, CTLRX_STRUCT_PREFIX)) {
    theIsVector = false;
    return aInner[0];
  }
  return nullptr;
}

void setTypeFromName(STLRXSchemaField &theField, const char *theTypeName) {
  theField.mShape = fdfSchemaShape(theTypeName);
  theField.mValueType = theField.mShape == CTLRX_DS_MULTIPLE ? CTLRX_DS_FIELD_POINTER : fdfSchemaValueType(theTypeName);
}

// One field declaration of a section.
STLRXSchemaField readFieldDeclaration(const CXmlElement &theElement) {
  STLRXSchemaField aField;
  aField.mName = theElement.getAttribute("name");
  if (const char *aType = theElement.getAttribute("type")) {
    setTypeFromName(aField, aType);
    return aField;
  }
  bool aVectorMembers = false;
  if (const CXmlElement *aWrapper = structWrapper(theElement, aVectorMembers)) {
    const std::vector<const CXmlElement *> aMembers = typedMembersIn(*aWrapper);
    aField.mShape = CTLRX_DS_MULTIPLE;
    aField.mValueType = CTLRX_DS_FIELD_POINTER;
    // Members share one declaration: the first member's type decides. The
    // members of a vector of structs are vectors, whatever scalar type
    // their per-element declaration carries.
    for (const CXmlElement *aMember : aMembers) {
      aField.mMemberNames.push_back(aMember->getAttribute("name"));
    }
    if (!aMembers.empty()) {
      const char *aType = aMembers.front()->getAttribute("type");
      aField.mMemberShape = aVectorMembers ? CTLRX_DS_VECTOR : fdfSchemaShape(aType);
      aField.mMemberValueType = fdfSchemaValueType(aType);
    }
    return aField;
  }
  const CXmlElement *aBase = firstDescendant(theElement, "xs:restriction");
  if (aBase == nullptr) {
    aBase = firstDescendant(theElement, "xs:extension");
  }
  if (aBase != nullptr) {
    setTypeFromName(aField, aBase->getAttribute("base"));
  }
  return aField;
}

std::string schemaPath(const std::string &theRootName, const char *theSchemaName) {
  if (theSchemaName != nullptr && theSchemaName[0] != '\0' && fdfExistFile(theSchemaName)) {
    return theSchemaName;
  }
  std::string aDir;
  if (!fdfGetEnvVar(aDir, CTLRX_SCHEMA_DIR_SETTING)) {
    aDir.clear();
  }
  const std::string aName = theSchemaName != nullptr && theSchemaName[0] != '\0' ? theSchemaName : theRootName;
  return aDir + aName + ".xsd";
}

} // namespace

int32_t fdfSchemaShape(const char *theTypeName) { return applyRules(CTLRX_SHAPE_RULES, theTypeName); }

int32_t fdfSchemaValueType(const char *theTypeName) { return applyRules(CTLRX_VALUE_TYPE_RULES, theTypeName); }

int32_t STLRXSchemaSection::builtFieldCount() const {
  int32_t aCount = 0;
  for (const STLRXSchemaField &aField : mFields) {
    aCount += 1 + static_cast<int32_t>(aField.mMemberNames.size());
  }
  return aCount;
}

// ------------------------------------------------------------------ schema

bool CXmlSchema::load(const char *theRootName, const char *theSchemaName) {
  release();
  mRootName = theRootName != nullptr ? theRootName : CTLRX_DS_DEFAULT_ROOT_TAG;
  const std::string aPath = schemaPath(mRootName, theSchemaName);
  if (!fdfExistFile(aPath.c_str())) {
    fdfTraceMessage("Schema file not found : %s\n", aPath.c_str());
    return false;
  }
  CXmlElementTree aTree;
  if (!aTree.parseFile(aPath.c_str(), CTLRX_SCHEMA_MAX_LINE)) {
    TLRX_RAISE(CTLRX_ERR_FILE_PARSE, aPath.c_str());
  }

  const CXmlElement *aRoot = nullptr;
  for (size_t i = 0; i < aTree.getElementCount() && aRoot == nullptr; ++i) {
    const CXmlElement &aElement = aTree.getElement(i);
    const char *aName = aElement.getAttribute("name");
    if (isNamed(aElement, CTLRX_XS_ELEMENT) && aName != nullptr && std::strstr(aName, mRootName.c_str()) != nullptr) {
      aRoot = &aElement;
    }
  }
  if (aRoot == nullptr) {
    fdfTraceMessage("Root declaration %s not found in %s\n", mRootName.c_str(), aPath.c_str());
    return false;
  }

  for (const CXmlElement *aSectionElement : declarationsIn(*aRoot)) {
    const char *aSectionName = aSectionElement->getAttribute("name");
    if (aSectionName == nullptr) {
      continue;
    }
    fdfTraceMessage("Section[%d] =%s\n", static_cast<int>(mSections.size()), aSectionName);
    STLRXSchemaSection aSection;
    aSection.mName = aSectionName;
    for (const CXmlElement *aFieldElement : declarationsIn(*aSectionElement)) {
      if (aFieldElement->getAttribute("name") != nullptr) {
        aSection.mFields.push_back(readFieldDeclaration(*aFieldElement));
      }
    }
    mSections.push_back(std::move(aSection));
  }
  return true;
}

const STLRXSchemaSection *CXmlSchema::findSection(const char *theName) const {
  if (theName == nullptr) {
    return nullptr;
  }
  for (const STLRXSchemaSection &aSection : mSections) {
    if (aSection.mName == theName) {
      return &aSection;
    }
  }
  return nullptr;
}

void CXmlSchema::release() { mSections.clear(); }

bool fdfBuildSectionFromSchema(const STLRXSchemaSection &theDeclaration, CDescriptionSection &theSection) {
  theSection.releaseFields();
  theSection.setName(theDeclaration.mName.c_str());
  if (theDeclaration.mFields.empty()) {
    fdfTraceMessage("Section without fields : %s\n", theDeclaration.mName.c_str());
    return false;
  }
  if (theDeclaration.builtFieldCount() >= CTLRX_DS_MAX_NBR_FIELDS) {
    fdfTraceMessage("CTLRX_DS_MAX_NBR_FIELDS = %d\naFieldsNbr = %d\n", CTLRX_DS_MAX_NBR_FIELDS,
                    theDeclaration.builtFieldCount());
    return false;
  }
  for (const STLRXSchemaField &aDeclared : theDeclaration.mFields) {
    if (aDeclared.mShape != CTLRX_DS_MULTIPLE) {
      theSection.appendField(
          std::make_unique<CDescriptionField>(aDeclared.mName.c_str(), aDeclared.mShape, aDeclared.mValueType, -1));
      continue;
    }
    const int32_t aStructIndex = theSection.appendField(
        std::make_unique<CDescriptionField>(aDeclared.mName.c_str(), CTLRX_DS_MULTIPLE, CTLRX_DS_FIELD_POINTER, -1));
    CDescriptionField *aStruct = theSection.getField(aStructIndex);
    const int32_t aMemberCount = static_cast<int32_t>(aDeclared.mMemberNames.size());
    aStruct->allocateMembers(aMemberCount);
    for (int32_t i = 0; i < aMemberCount; ++i) {
      const int32_t aMemberIndex = theSection.appendField(
          std::make_unique<CDescriptionField>(aDeclared.mMemberNames[static_cast<size_t>(i)].c_str(),
                                              aDeclared.mMemberShape, aDeclared.mMemberValueType, aStructIndex));
      aStruct->setMember(i, theSection.getField(aMemberIndex));
    }
  }
  return true;
}

bool CDescription::declareFromSchema(const char *theSchemaName, const std::vector<std::string> &theSectionNames) {
  CXmlSchema aSchema;
  if (!aSchema.load(nullptr, theSchemaName)) {
    return false;
  }
  clear();
  setRootTag(aSchema.getRootName().c_str());
  for (const std::string &aName : theSectionNames) {
    const STLRXSchemaSection *aDeclaration = aSchema.findSection(aName.c_str());
    if (aDeclaration == nullptr) {
      fdfTraceMessage("Not found Section : %s\n", aName.c_str());
      return false;
    }
    CDescriptionSection *aSection = addSection(std::make_unique<CDescriptionSection>());
    if (!fdfBuildSectionFromSchema(*aDeclaration, *aSection)) {
      return false;
    }
  }
  return true;
}

// -------------------------------------------------------- parameter files

bool fdfInitParameters(const char *theSchemaName, const std::vector<std::string> &theSections, const char *theFile,
                       CDescription &theDescription) {
  std::string aDir;
  if (!fdfGetEnvVar(aDir, CTLRX_SCHEMA_DIR_SETTING)) {
    return false;
  }
  if (!theDescription.declareFromSchema(theSchemaName, theSections)) {
    return false;
  }
  if (!theDescription.readXML(theFile, true)) {
    return false;
  }
  theDescription.print(false);
  // An absent or unset environment is as wrong as another one.
  const CDescriptionField *aEnvironment = theDescription.findField("TellurixEnvironment");
  const bool aRight = aEnvironment != nullptr && aEnvironment->getValueType() == CTLRX_DS_STRING &&
                      aEnvironment->getShape() == CTLRX_DS_SCALAR && aEnvironment->holdsValue() &&
                      std::strcmp(aEnvironment->getString(), CTLRX_PARAMETER_ENVIRONMENT) == 0;
  if (!aRight) {
    fdfTraceMessage("\n\nWRONG ENVIROMENT CHOOSE\n\n");
  }
  return aRight;
}

void fdfLoadCommandParameters(const char *theSchemaName, const std::vector<std::string> &theSections,
                              const char *theFile, CDescription &theDescription) {
  if (fdfInitParameters(theSchemaName, theSections, theFile, theDescription)) {
    return;
  }
  const char *aFile = theFile != nullptr ? theFile : "";
  fdfLogMessage("\nError occour during initialization XML input parameter: [%s]", aFile);
  fdfTraceMessage("Error occour during initialization XML input parameter");
  TLRX_RAISE(CTLRX_ERR_PARAMETER_FILE, aFile);
}
