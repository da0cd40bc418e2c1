// Header schemas: type-name rules, the schema loader, descriptions declared
// from schemas, and the installed header and parameter schemas.
#include "tlrx_description_section.h"
#include "tlrx_description_xml.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_init_from_xml_schema.h"
#include "tlrx_standard_header.h"
#include "tlrx_description_test_support.h"
#include "tlrx_test_support.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstdlib>
#include <string>
#include <vector>

namespace {

class SchemaTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }

  // A schema file whose root HEADER_INFO holds theSections (xs:element text).
  std::string writeSchema(const std::string &theSections, const std::string &theName = "test.xsd") {
    const std::string aPath = mDir.file(theName);
    tlrxWriteFile(aPath, "<?xml version=\"1.0\"?>\n"
                         "<xs:schema xmlns:xs=\"http://www.w3.org/2001/XMLSchema\">\n"
                         " <xs:element name=\"NOT_THE_ROOT\" type=\"xs:string\"/>\n"
                         " <xs:element name=\"HEADER_INFO\">\n"
                         "  <xs:complexType>\n"
                         "   <xs:sequence>\n" +
                             theSections +
                             "   </xs:sequence>\n"
                             "  </xs:complexType>\n"
                             " </xs:element>\n"
                             "</xs:schema>\n");
    return aPath;
  }

  std::string sampleSchema() {
    return writeSchema(R"(
    <xs:element name="S1">
     <xs:complexType><xs:sequence>
      <xs:element name="a" type="xs:double"/>
      <xs:element name="b" type="VectorDouble"/>
      <xs:element name="c" type="TellurixFlagType"/>
      <xs:element name="d"><xs:simpleType><xs:restriction base="xs:long"/></xs:simpleType></xs:element>
      <xs:element name="e"><xs:complexType><xs:complexContent>
        <xs:extension base="MatrixString"/></xs:complexContent></xs:complexType></xs:element>
      <xs:element name="f"><xs:complexType><xs:sequence>
        <xs:element name="VectorOfStructs_f"><xs:complexType><xs:sequence>
          <xs:element name="VectorOfStructsValues_f" maxOccurs="unbounded"><xs:complexType><xs:sequence>
            <xs:element name="m1" type="xs:double"/>
            <xs:element name="m2" type="xs:double"/>
          </xs:sequence></xs:complexType></xs:element>
        </xs:sequence></xs:complexType></xs:element>
      </xs:sequence></xs:complexType></xs:element>
      <xs:element name="g"><xs:complexType><xs:sequence>
        <xs:element name="Struct_g"><xs:complexType><xs:sequence>
          <xs:element name="p" type="xs:string"/>
          <xs:element name="q" type="xs:string"/>
        </xs:sequence></xs:complexType></xs:element>
      </xs:sequence></xs:complexType></xs:element>
      <xs:element name="h" type="WeirdType"/>
      <xs:element name="i" type="xs:anyType"/>
     </xs:sequence></xs:complexType>
    </xs:element>
    <xs:element name="S2">
     <xs:complexType><xs:all>
      <xs:element name="x" type="xs:string"/>
     </xs:all></xs:complexType>
    </xs:element>
    <xs:element name="Empty"><xs:complexType/></xs:element>
)");
  }
};

} // namespace

TEST(SchemaTypeNames, FirstMatchingRuleDecidesShapeAndValueType) {
  struct SRow {
    const char *mName;
    int32_t mShape;
    int32_t mType;
  };
  const SRow aRows[] = {
      {"xs:double", 0, 1},
      {"xs:long", 0, 0},
      {"xs:string", 0, 2},
      {"VectorDouble", 1, 1},
      {"tlrx:VectorInteger", 1, 0},
      {"MatrixString", 2, 2},
      {"TellurixFlagType", 0, 2},
      {"TellurixInterpolationType", 0, 2},
      {"xs:anyType", 3, -1},
      {"xs:int", 0, -1},         // scalar, but no value type rule matches
      {"xs:VectorDouble", 0, 1}, // "xs:" is tested before "Vector"
      {"VectorFlagType", 1, -1},
      {"Something", -1, -1},
      {"", -1, -1},
  };
  for (const SRow &aRow : aRows) {
    EXPECT_EQ(fdfSchemaShape(aRow.mName), aRow.mShape) << aRow.mName;
    EXPECT_EQ(fdfSchemaValueType(aRow.mName), aRow.mType) << aRow.mName;
  }
  EXPECT_EQ(fdfSchemaShape(nullptr), -1);
  EXPECT_EQ(fdfSchemaValueType(nullptr), -1);
}

TEST_F(SchemaTest, LoaderReadsSectionsTypesRestrictionsAndStructs) {
  CXmlSchema aSchema;
  ASSERT_TRUE(aSchema.load(nullptr, sampleSchema().c_str()));
  EXPECT_EQ(aSchema.getRootName(), "HEADER_INFO");
  ASSERT_EQ(aSchema.getSections().size(), 3u);
  EXPECT_EQ(aSchema.getSections()[0].mName, "S1");
  EXPECT_EQ(aSchema.getSections()[1].mName, "S2");
  EXPECT_EQ(aSchema.getSections()[2].mName, "Empty");
  EXPECT_TRUE(aSchema.getSections()[2].mFields.empty());

  const STLRXSchemaSection *aS1 = aSchema.findSection("S1");
  ASSERT_NE(aS1, nullptr);
  ASSERT_EQ(aS1->mFields.size(), 9u);
  struct SRow {
    const char *mName;
    int32_t mShape;
    int32_t mType;
  };
  const SRow aRows[] = {{"a", 0, 1}, {"b", 1, 1}, {"c", 0, 2},   {"d", 0, 0}, {"e", 2, 2},
                        {"f", 3, 3}, {"g", 3, 3}, {"h", -1, -1}, {"i", 3, 3}};
  for (size_t i = 0; i < 9; ++i) {
    EXPECT_EQ(aS1->mFields[i].mName, aRows[i].mName);
    EXPECT_EQ(aS1->mFields[i].mShape, aRows[i].mShape) << aRows[i].mName;
    EXPECT_EQ(aS1->mFields[i].mValueType, aRows[i].mType) << aRows[i].mName;
  }
  const STLRXSchemaField &aF = aS1->mFields[5];
  EXPECT_EQ(aF.mMemberNames, (std::vector<std::string>{"m1", "m2"}));
  EXPECT_EQ(aF.mMemberShape, CTLRX_DS_VECTOR); // members of a vector of structs are vectors
  EXPECT_EQ(aF.mMemberValueType, CTLRX_DS_DOUBLE);
  const STLRXSchemaField &aG = aS1->mFields[6];
  EXPECT_EQ(aG.mMemberNames, (std::vector<std::string>{"p", "q"}));
  EXPECT_EQ(aG.mMemberShape, CTLRX_DS_SCALAR);
  EXPECT_EQ(aG.mMemberValueType, CTLRX_DS_STRING);
  EXPECT_TRUE(aS1->mFields[8].mMemberNames.empty());
  EXPECT_EQ(aS1->builtFieldCount(), 13);
  EXPECT_EQ(aSchema.findSection("NOT_THE_ROOT"), nullptr);
  aSchema.release();
  EXPECT_TRUE(aSchema.getSections().empty());
}

TEST_F(SchemaTest, DeclaredSectionsFollowTheListAndPlaceMembersAfterTheirStruct) {
  CDescription aDescription;
  aDescription.setRootTag("SOMETHING_ELSE");
  ASSERT_TRUE(aDescription.declareFromSchema(sampleSchema().c_str(), {"S2", "S1"}));
  EXPECT_STREQ(aDescription.getRootTag(), "HEADER_INFO");
  ASSERT_EQ(aDescription.getSectionCount(), 2);
  EXPECT_STREQ(aDescription.getSection(0)->getName(), "S2");
  const CDescriptionSection &aS1 = *aDescription.getSection(1);
  ASSERT_EQ(aS1.getFieldCount(), 13);
  const char *aOrder[] = {"a", "b", "c", "d", "e", "f", "m1", "m2", "g", "p", "q", "h", "i"};
  for (int32_t i = 0; i < 13; ++i) {
    EXPECT_STREQ(aS1.getField(i)->getName(), aOrder[i]);
  }
  CDescriptionField &aF = *aS1.getField(5);
  EXPECT_EQ(aF.getMemberCount(), 2);
  EXPECT_EQ(aS1.getField(6)->getParentIndex(), 5);
  EXPECT_EQ(aS1.getField(7)->getParentIndex(), 5);
  EXPECT_EQ(aF.getMember(1), aS1.getField(7));
  aF.setNumberOfElements(4);
  EXPECT_EQ(aS1.getField(7)->getColNbr(), 4);
  EXPECT_TRUE(aF.holdsValue());
  EXPECT_EQ(aS1.getField(9)->getParentIndex(), 8);
  EXPECT_EQ(aS1.getField(10)->getShape(), CTLRX_DS_SCALAR);
  EXPECT_EQ(aS1.getField(12)->getMemberCount(), 0);
  EXPECT_EQ(aS1.getField(0)->getParentIndex(), -1);
}

TEST_F(SchemaTest, FieldOfAnUnknownTypeRefusesEveryAccess) {
  CDescription aDescription;
  ASSERT_TRUE(aDescription.declareFromSchema(sampleSchema().c_str(), {"S1"}));
  CDescriptionField &aH = aDescription.getField("S1.h");
  EXPECT_EQ(aH.getShape(), -1);
  EXPECT_EQ(aH.getValueType(), -1);
  EXPECT_FALSE(aH.holdsValue());
  EXPECT_EQ(tlrxCodeOf([&] { aH.getString(); }), CTLRX_ERR_DS_TYPE);
  EXPECT_EQ(tlrxCodeOf([&] { aH.getDouble(); }), CTLRX_ERR_DS_TYPE);
  EXPECT_EQ(tlrxCodeOf([&] { aH.getInteger(0); }), CTLRX_ERR_DS_TYPE);
  EXPECT_EQ(tlrxCodeOf([&] { aH.allocate(1, 1); }), CTLRX_ERR_DS_TYPE);
  EXPECT_EQ(tlrxCodeOf([&] { aH.setNumberOfElements(2); }), CTLRX_ERR_DS_TYPE);
  // Scalar-typed but without a value type: a scalar cell refuses typed values.
  CDescription aOther;
  const std::string aPath = writeSchema(R"(<xs:element name="T"><xs:complexType><xs:sequence>
      <xs:element name="n" type="xs:int"/></xs:sequence></xs:complexType></xs:element>)",
                                        "int.xsd");
  ASSERT_TRUE(aOther.declareFromSchema(aPath.c_str(), {"T"}));
  EXPECT_EQ(tlrxCodeOf([&] { aOther.getField("T.n").setInteger(3); }), CTLRX_ERR_DS_TYPE);
  EXPECT_EQ(tlrxCodeOf([&] { aOther.getField("T.n").setString("3"); }), CTLRX_ERR_DS_TYPE);
}

TEST_F(SchemaTest, UndeclaredOrEmptySectionFailsTheDeclaration) {
  const std::string aPath = sampleSchema();
  CDescription aDescription;
  EXPECT_FALSE(aDescription.declareFromSchema(aPath.c_str(), {"S2", "Nope", "S1"}));
  ASSERT_EQ(aDescription.getSectionCount(), 1); // the sections before it are built
  EXPECT_STREQ(aDescription.getSection(0)->getName(), "S2");
  EXPECT_FALSE(aDescription.declareFromSchema(aPath.c_str(), {"Empty"}));
}

TEST_F(SchemaTest, SchemaFilesAreFoundByPathOrInTheSchemaDirectory) {
  // An existing path is used as it is, whatever its extension.
  tlrxWriteFile(mDir.file("plain.schema"), tlrxReadFile(sampleSchema()));
  CXmlSchema aSchema;
  EXPECT_TRUE(aSchema.load(nullptr, mDir.file("plain.schema").c_str()));
  // A bare name is looked for in the schema directory with ".xsd".
  EXPECT_TRUE(aSchema.load(nullptr, "PARAMETERS_INFO_MT_FEAT_EXT_CMD"));
  EXPECT_NE(aSchema.findSection("MAIN_CMD"), nullptr);
  EXPECT_FALSE(aSchema.load(nullptr, mDir.file("missing.xsd").c_str()));
  EXPECT_FALSE(aSchema.load(nullptr, "NO_SUCH_SCHEMA"));
  // Without a name: the root name with ".xsd", which does not exist here.
  EXPECT_FALSE(aSchema.load(nullptr, nullptr));
  // A root name that no declaration carries.
  EXPECT_FALSE(aSchema.load("NOWHERE_ROOT", "PARAMETERS_INFO_MT_FEAT_EXT_CMD"));
  CDescription aDescription;
  EXPECT_FALSE(aDescription.declareFromSchema(mDir.file("missing.xsd").c_str(), {"MAIN_CMD"}));
}

TEST_F(SchemaTest, UnparsableSchemaRaisesWithItsPath) {
  for (const char *aText : {"<xs:schema><xs:element name=\"HEADER_INFO\">", "not xml at all", ""}) {
    const std::string aPath = mDir.file("broken.xsd");
    tlrxWriteFile(aPath, aText);
    CXmlSchema aSchema;
    std::string aMessage;
    EXPECT_EQ(tlrxCodeOf([&] { aSchema.load(nullptr, aPath.c_str()); }, &aMessage), CTLRX_ERR_FILE_PARSE) << aText;
    EXPECT_EQ(aMessage, aPath);
  }
  EXPECT_EQ(fdfScratchBuffersInUse(), 0);
}

TEST_F(SchemaTest, DeeplyNestedSchemaIsWalkedWithoutRecursion) {
  const int aDepth = 100000;
  std::string aNested;
  aNested.reserve(static_cast<size_t>(aDepth) * 24);
  for (int i = 0; i < aDepth; ++i) {
    aNested += "<xs:choice>\n";
  }
  aNested += "<xs:element name=\"deep\" type=\"xs:double\"/>\n";
  for (int i = 0; i < aDepth; ++i) {
    aNested += "</xs:choice>\n";
  }
  const std::string aPath =
      writeSchema("<xs:element name=\"D\"><xs:complexType>\n" + aNested + "</xs:complexType></xs:element>\n");
  CDescription aDescription;
  ASSERT_TRUE(aDescription.declareFromSchema(aPath.c_str(), {"D"}));
  EXPECT_NE(aDescription.findField("D.deep"), nullptr);
}

// The header schema is generated from the key files: both declarations of
// the standard header must agree field by field.
TEST_F(SchemaTest, HeaderSchemaDeclaresWhatTheKeyFilesDeclare) {
  CDescription aFromKeys;
  fdfDeclareStandardHeader(aFromKeys);
  CDescription aFromSchema;
  ASSERT_TRUE(aFromSchema.declareFromSchema("TellurixHeaderSchema_version_1.0", fdfStandardHeaderSections()));
  ASSERT_EQ(aFromSchema.getSectionCount(), aFromKeys.getSectionCount());
  for (int32_t s = 0; s < aFromKeys.getSectionCount(); ++s) {
    const CDescriptionSection &aK = *aFromKeys.getSection(s);
    const CDescriptionSection &aX = *aFromSchema.getSection(s);
    ASSERT_STREQ(aK.getName(), aX.getName());
    ASSERT_EQ(aK.getFieldCount(), aX.getFieldCount()) << aK.getName();
    for (int32_t f = 0; f < aK.getFieldCount(); ++f) {
      const CDescriptionField &aFK = *aK.getField(f);
      const CDescriptionField &aFX = *aX.getField(f);
      SCOPED_TRACE(std::string(aK.getName()) + "." + aFK.getName());
      EXPECT_STREQ(aFK.getName(), aFX.getName());
      EXPECT_EQ(aFK.getShape(), aFX.getShape());
      EXPECT_EQ(aFK.getValueType(), aFX.getValueType());
      EXPECT_EQ(aFK.getParentIndex(), aFX.getParentIndex());
      EXPECT_EQ(aFK.getMemberCount(), aFX.getMemberCount());
    }
  }
}

// A header written with every field holding a value is valid against the
// installed header schema, as checked by xmllint.
TEST_F(SchemaTest, WrittenHeaderValidatesAgainstTheHeaderSchema) {
  if (std::system("xmllint --version > /dev/null 2>&1") != 0) {
    GTEST_SKIP() << "xmllint is not installed";
  }
  CDescription aHeader;
  fdfDeclareStandardHeader(aHeader);
  for (int32_t s = 0; s < aHeader.getSectionCount(); ++s) {
    CDescriptionSection &aSection = *aHeader.getSection(s);
    for (int32_t f = 0; f < aSection.getFieldCount(); ++f) {
      CDescriptionField &aField = *aSection.getField(f);
      if (aField.getShape() == CTLRX_DS_MULTIPLE) {
        aField.setNumberOfElements(2);
        continue;
      }
      if (aField.getShape() != CTLRX_DS_SCALAR && aField.getParentIndex() < 0) {
        aField.allocate(aField.getShape() == CTLRX_DS_MATRIX ? 2 : 1, 2);
      }
      for (int32_t r = 0; r < aField.getRowNbr(); ++r) {
        for (int32_t c = 0; c < aField.getColNbr(); ++c) {
          if (aField.getValueType() == CTLRX_DS_INTEGER) {
            aField.setInteger(r, c, 7 + c);
          } else if (aField.getValueType() == CTLRX_DS_DOUBLE) {
            aField.setDouble(r, c, c == 0 ? std::nan("") : 1.0 / 3.0);
          } else if (c == 0) { // the second string cell stays unset
            aField.setString(r, c, "a <b> & \"c\"");
          }
        }
      }
    }
  }
  // Only the XML form is checked here: no ENVI header for these values.
  const TLRXEnviHeaderWriter aEnvi = fdfSetEnviHeaderWriter(nullptr);
  const std::string aRaster = mDir.file("full");
  const bool aWritten = fdfWriteStandardHeader(aRaster.c_str(), aHeader, true);
  fdfSetEnviHeaderWriter(aEnvi);
  ASSERT_TRUE(aWritten);
  const std::string aSchema = tlrxDataDir() + "/xml_schemas/TellurixHeaderSchema_version_1.0.xsd";
  const std::string aCommand =
      "xmllint --noout --schema '" + aSchema + "' '" + aRaster + ".sml' > '" + mDir.file("xmllint.txt") + "' 2>&1";
  EXPECT_EQ(std::system(aCommand.c_str()), 0) << tlrxReadFile(mDir.file("xmllint.txt"));
}
