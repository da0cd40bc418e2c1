// Header schemas: type-name rules, the schema loader, descriptions declared
// from schemas, the installed header and parameter schemas, command
// parameter files, and the standard header read and written for a raster.
#include "tlrx_description_test_support.h"
#include "tlrx_description_xml.h"
#include "tlrx_enviroment.h"
#include "tlrx_generic_utility.h"
#include "tlrx_init_from_xml_schema.h"
#include "tlrx_standard_header.h"

#include <cstdlib>
#include <functional>

namespace {

const char *const CTLRX_TEMPORAL_SCHEMA = "PARAMETERS_INFO_MT_FEAT_EXT_CMD";

class SchemaTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }

  // A schema file whose root HEADER_INFO holds theSections (xs:element text).
  std::string writeSchema(const std::string &theSections, const std::string &theName = "test.xsd") {
    tlrxWriteFile(mDir.file(theName), "<xs:schema xmlns:xs=\"http://www.w3.org/2001/XMLSchema\">\n"
                                      " <xs:element name=\"NOT_THE_ROOT\" type=\"xs:string\"/>\n"
                                      " <xs:element name=\"HEADER_INFO\">\n  <xs:complexType>\n   <xs:sequence>\n" +
                                          theSections + "   </xs:sequence>\n  </xs:complexType>\n </xs:element>\n"
                                                        "</xs:schema>\n");
    return mDir.file(theName);
  }
  std::string sampleSchema() {
    return writeSchema(R"(<xs:element name="S1"><xs:complexType><xs:sequence>
      <xs:element name="a" type="xs:double"/><xs:element name="b" type="VectorDouble"/>
      <xs:element name="c" type="TellurixFlagType"/>
      <xs:element name="d"><xs:simpleType><xs:restriction base="xs:long"/></xs:simpleType></xs:element>
      <xs:element name="e"><xs:complexType><xs:complexContent><xs:extension base="MatrixString"/></xs:complexContent>
      </xs:complexType></xs:element>
      <xs:element name="f"><xs:complexType><xs:sequence><xs:element name="VectorOfStructs_f"><xs:complexType>
        <xs:sequence>
        <xs:element name="VectorOfStructsValues_f" maxOccurs="unbounded"><xs:complexType><xs:sequence>
          <xs:element name="m1" type="xs:double"/><xs:element name="m2" type="xs:double"/>
        </xs:sequence></xs:complexType></xs:element></xs:sequence></xs:complexType></xs:element>
      </xs:sequence></xs:complexType></xs:element>
      <xs:element name="g"><xs:complexType><xs:sequence><xs:element name="Struct_g"><xs:complexType><xs:sequence>
        <xs:element name="p" type="xs:string"/><xs:element name="q" type="xs:string"/>
      </xs:sequence></xs:complexType></xs:element></xs:sequence></xs:complexType></xs:element>
      <xs:element name="h" type="WeirdType"/><xs:element name="i" type="xs:anyType"/>
    </xs:sequence></xs:complexType></xs:element>
    <xs:element name="S2"><xs:complexType><xs:all><xs:element name="x" type="xs:string"/></xs:all></xs:complexType>
    </xs:element>
    <xs:element name="Empty"><xs:complexType/></xs:element>
)");
  }

  // A parameter file of the temporal command with theEnvironment (nullptr: none) under theRoot.
  std::string temporalFile(const char *theEnvironment, const std::string &theRoot = "HEADER_INFO") {
    std::string aText = "<" + theRoot + "><MAIN_CMD><input_file_list><VectorString NumberOfElements = \"2\">"
                        "<ValueString ID = \"0\">/data/a</ValueString><ValueString ID = \"1\">/data/b</ValueString>"
                        "</VectorString></input_file_list><out_root_file_name>/data/out</out_root_file_name>\n"
                        "<max_increment_thr_db>3.5</max_increment_thr_db><mean>OK</mean><std>ok</std>"
                        "<median>Ok</median>";
    if (theEnvironment != nullptr)
      aText += std::string("<TellurixEnvironment>") + theEnvironment + "</TellurixEnvironment>";
    tlrxWriteFile(mDir.file("temporal.xml"), aText + "</MAIN_CMD></" + theRoot + ">\n");
    return mDir.file("temporal.xml");
  }
  // Initialising theFile with theSections; the code and message of loading it for a command.
  bool init(const std::string &theFile, const std::vector<std::string> &theSections = {"MAIN_CMD"},
            const char *theSchema = CTLRX_TEMPORAL_SCHEMA) {
    return fdfInitParameters(theSchema, theSections, theFile.c_str(), mParameters);
  }
  int32_t load(const std::string &theFile, const std::vector<std::string> &theSections = {"MAIN_CMD"},
               std::string *theMessage = nullptr) {
    auto aLoad = [&] { fdfLoadCommandParameters(CTLRX_TEMPORAL_SCHEMA, theSections, theFile.c_str(), mParameters); };
    return tlrxCodeOf(aLoad, theMessage);
  }
  CDescription mParameters;
};

} // namespace

TEST(SchemaTypeNames, FirstMatchingRuleDecidesShapeAndValueType) {
  const struct {
    const char *mName;
    int32_t mShape, mType;
  } aRows[] = {{"xs:double", 0, 1},  {"xs:long", 0, 0},          {"xs:string", 0, 2},     {"VectorDouble", 1, 1},
               {"tlrx:VectorInteger", 1, 0}, {"MatrixString", 2, 2}, {"TellurixFlagType", 0, 2},
               {"TellurixInterpolationType", 0, 2}, {"xs:anyType", 3, -1},
               {"xs:int", 0, -1},         // scalar, but no value type rule matches
               {"xs:VectorDouble", 0, 1}, // "xs:" is tested before "Vector"
               {"VectorFlagType", 1, -1}, {"Something", -1, -1}, {"", -1, -1}};
  for (const auto &aRow : aRows) {
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
  EXPECT_EQ(aSchema.getSections()[0].mName + aSchema.getSections()[1].mName + aSchema.getSections()[2].mName,
            "S1S2Empty");
  EXPECT_TRUE(aSchema.getSections()[2].mFields.empty());
  const STLRXSchemaSection *aS1 = aSchema.findSection("S1");
  ASSERT_NE(aS1, nullptr);
  ASSERT_EQ(aS1->mFields.size(), 9u);
  const int32_t aRows[][2] = {{0, 1}, {1, 1}, {0, 2}, {0, 0}, {2, 2}, {3, 3}, {3, 3}, {-1, -1}, {3, 3}};
  for (size_t i = 0; i < 9; ++i) {
    EXPECT_EQ(aS1->mFields[i].mName, std::string(1, static_cast<char>('a' + i)));
    EXPECT_EQ(aS1->mFields[i].mShape, aRows[i][0]) << i;
    EXPECT_EQ(aS1->mFields[i].mValueType, aRows[i][1]) << i;
  }
  const STLRXSchemaField &aF = aS1->mFields[5], &aG = aS1->mFields[6];
  EXPECT_EQ(aF.mMemberNames, (std::vector<std::string>{"m1", "m2"}));
  EXPECT_EQ(aF.mMemberShape, CTLRX_DS_VECTOR); // members of a vector of structs are vectors
  EXPECT_EQ(aF.mMemberValueType, CTLRX_DS_DOUBLE);
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
  const int32_t aParents[] = {-1, -1, -1, -1, -1, -1, 5, 5, -1, 8, 8, -1, -1};
  for (int32_t i = 0; i < 13; ++i) {
    EXPECT_STREQ(aS1.getField(i)->getName(), aOrder[i]);
    EXPECT_EQ(aS1.getField(i)->getParentIndex(), aParents[i]) << aOrder[i];
  }
  CDescriptionField &aF = *aS1.getField(5);
  EXPECT_EQ(aF.getMemberCount(), 2);
  EXPECT_EQ(aF.getMember(1), aS1.getField(7));
  aF.setNumberOfElements(4);
  EXPECT_EQ(aS1.getField(7)->getColNbr(), 4);
  EXPECT_TRUE(aF.holdsValue());
  EXPECT_EQ(aS1.getField(10)->getShape(), CTLRX_DS_SCALAR);
  EXPECT_EQ(aS1.getField(12)->getMemberCount(), 0);
  // A field of an unknown type refuses every access.
  CDescriptionField &aH = *aS1.getField(11);
  EXPECT_EQ(aH.getShape(), -1);
  EXPECT_EQ(aH.getValueType(), -1);
  EXPECT_FALSE(aH.holdsValue());
  for (const auto &aCall : std::vector<std::function<void()>>{[&] { aH.getString(); }, [&] { aH.getDouble(); },
                                                              [&] { aH.getInteger(0); }, [&] { aH.allocate(1, 1); },
                                                              [&] { aH.setNumberOfElements(2); }})
    EXPECT_EQ(tlrxCodeOf(aCall), CTLRX_ERR_DS_TYPE);
  // Scalar-typed but without a value type: a scalar cell refuses typed values.
  CDescription aOther;
  ASSERT_TRUE(aOther.declareFromSchema(writeSchema("<xs:element name=\"T\"><xs:complexType><xs:sequence><xs:element "
                                                   "name=\"n\" type=\"xs:int\"/></xs:sequence></xs:complexType>"
                                                   "</xs:element>",
                                                   "int.xsd")
                                           .c_str(),
                                       {"T"}));
  EXPECT_EQ(tlrxCodeOf([&] { aOther.getField("T.n").setInteger(3); }), CTLRX_ERR_DS_TYPE);
  EXPECT_EQ(tlrxCodeOf([&] { aOther.getField("T.n").setString("3"); }), CTLRX_ERR_DS_TYPE);
}

// A schema is found by its path, or by a bare name in the schema folder; an
// undeclared or empty section fails the declaration; an unparsable file raises.
TEST_F(SchemaTest, SchemaFilesAreFoundByPathOrInTheSchemaDirectory) {
  tlrxWriteFile(mDir.file("plain.schema"), tlrxReadFile(sampleSchema()));
  CXmlSchema aSchema;
  EXPECT_TRUE(aSchema.load(nullptr, mDir.file("plain.schema").c_str()));
  EXPECT_TRUE(aSchema.load(nullptr, CTLRX_TEMPORAL_SCHEMA));
  EXPECT_NE(aSchema.findSection("MAIN_CMD"), nullptr);
  EXPECT_FALSE(aSchema.load(nullptr, mDir.file("missing.xsd").c_str()));
  EXPECT_FALSE(aSchema.load(nullptr, "NO_SUCH_SCHEMA"));
  EXPECT_FALSE(aSchema.load(nullptr, nullptr)); // the root name with ".xsd", which does not exist here
  EXPECT_FALSE(aSchema.load("NOWHERE_ROOT", CTLRX_TEMPORAL_SCHEMA));
  CDescription aDescription;
  EXPECT_FALSE(aDescription.declareFromSchema(mDir.file("missing.xsd").c_str(), {"MAIN_CMD"}));
  const std::string aPath = mDir.file("test.xsd");
  EXPECT_FALSE(aDescription.declareFromSchema(aPath.c_str(), {"S2", "Nope", "S1"}));
  ASSERT_EQ(aDescription.getSectionCount(), 1);
  EXPECT_STREQ(aDescription.getSection(0)->getName(), "S2");
  EXPECT_FALSE(aDescription.declareFromSchema(aPath.c_str(), {"Empty"}));
  for (const char *aText : {"<xs:schema><xs:element name=\"HEADER_INFO\">", "not xml at all", ""}) {
    tlrxWriteFile(aPath, aText);
    std::string aMessage;
    EXPECT_EQ(tlrxCodeOf([&] { aSchema.load(nullptr, aPath.c_str()); }, &aMessage), CTLRX_ERR_FILE_PARSE) << aText;
    EXPECT_EQ(aMessage, aPath);
  }
  EXPECT_EQ(fdfScratchBuffersInUse(), 0);
}

TEST_F(SchemaTest, DeeplyNestedSchemaIsWalkedWithoutRecursion) {
  std::string aNested;
  for (int i = 0; i < 100000; ++i)
    aNested += "<xs:choice>\n";
  aNested += "<xs:element name=\"deep\" type=\"xs:double\"/>\n";
  for (int i = 0; i < 100000; ++i)
    aNested += "</xs:choice>\n";
  CDescription aDescription;
  ASSERT_TRUE(aDescription.declareFromSchema(
      writeSchema("<xs:element name=\"D\"><xs:complexType>\n" + aNested + "</xs:complexType></xs:element>\n").c_str(),
      {"D"}));
  EXPECT_NE(aDescription.findField("D.deep"), nullptr);
}

// The header schema is generated from the key files: both declarations of
// the standard header must agree field by field.
TEST_F(SchemaTest, HeaderSchemaDeclaresWhatTheKeyFilesDeclare) {
  CDescription aFromKeys, aFromSchema;
  fdfDeclareStandardHeader(aFromKeys);
  ASSERT_TRUE(aFromSchema.declareFromSchema("TellurixHeaderSchema_version_1.0", fdfStandardHeaderSections()));
  ASSERT_EQ(aFromSchema.getSectionCount(), aFromKeys.getSectionCount());
  for (int32_t s = 0; s < aFromKeys.getSectionCount(); ++s) {
    const CDescriptionSection &aK = *aFromKeys.getSection(s), &aX = *aFromSchema.getSection(s);
    ASSERT_STREQ(aK.getName(), aX.getName());
    ASSERT_EQ(aK.getFieldCount(), aX.getFieldCount()) << aK.getName();
    for (int32_t f = 0; f < aK.getFieldCount(); ++f) {
      const CDescriptionField &aFK = *aK.getField(f), &aFX = *aX.getField(f);
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
  if (std::system("xmllint --version > /dev/null 2>&1") != 0)
    GTEST_SKIP() << "xmllint is not installed";
  CDescription aHeader;
  fdfDeclareStandardHeader(aHeader);
  for (int32_t s = 0; s < aHeader.getSectionCount(); ++s) {
    for (int32_t f = 0; f < aHeader.getSection(s)->getFieldCount(); ++f) {
      CDescriptionField &aField = *aHeader.getSection(s)->getField(f);
      if (aField.getShape() == CTLRX_DS_MULTIPLE) {
        aField.setNumberOfElements(2);
        continue;
      }
      if (aField.getShape() != CTLRX_DS_SCALAR && aField.getParentIndex() < 0)
        aField.allocate(aField.getShape() == CTLRX_DS_MATRIX ? 2 : 1, 2);
      for (int32_t r = 0; r < aField.getRowNbr(); ++r) {
        for (int32_t c = 0; c < aField.getColNbr(); ++c) {
          if (aField.getValueType() == CTLRX_DS_INTEGER)
            aField.setInteger(r, c, 7 + c);
          else if (aField.getValueType() == CTLRX_DS_DOUBLE)
            aField.setDouble(r, c, c == 0 ? std::nan("") : 1.0 / 3.0);
          else if (c == 0) // the second string cell stays unset
            aField.setString(r, c, "a <b> & \"c\"");
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
  EXPECT_EQ(std::system(("xmllint --noout --schema '" + aSchema + "' '" + aRaster + ".sml' > '" +
                         mDir.file("xmllint.txt") + "' 2>&1")
                            .c_str()),
            0)
      << tlrxReadFile(mDir.file("xmllint.txt"));
}

TEST_F(SchemaTest, TemporalParameterFileInitialisesAndSwitchesAreExact) {
  const std::string aFile = temporalFile("IDL_ENVI_ENV");
  ASSERT_TRUE(init(aFile));
  const CDescriptionField &aList = mParameters.getField("MAIN_CMD.input_file_list");
  ASSERT_EQ(aList.getNumberOfElements(), 2);
  EXPECT_STREQ(aList.getString(1), "/data/b");
  EXPECT_EQ(mParameters.getField("MAIN_CMD.max_increment_thr_db").getDouble(), 3.5);
  EXPECT_TRUE(fdfIsSwitchOn(mParameters.getField("MAIN_CMD.mean").getString()));
  EXPECT_FALSE(fdfIsSwitchOn(mParameters.getField("MAIN_CMD.std").getString()));
  EXPECT_FALSE(fdfIsSwitchOn(mParameters.getField("MAIN_CMD.median").getString()));
  // A setting the file lacks, and one read with the wrong type.
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { mParameters.getFieldWithValue("MAIN_CMD.gradient"); }, &aMessage),
            CTLRX_ERR_DS_FIELD_MISSING);
  EXPECT_EQ(aMessage, "MAIN_CMD.gradient");
  EXPECT_EQ(tlrxCodeOf([&] { mParameters.getField("MAIN_CMD.max_increment_thr_db").getString(); }), CTLRX_ERR_DS_TYPE);
  EXPECT_EQ(load(aFile), 0);
}

// The environment must be exactly the supported one, under the exact root;
// no environment at all is refused the same way, not as a missing value.
TEST_F(SchemaTest, ParameterFilesOfAnotherEnvironmentOrRootAreRefused) {
  const std::pair<const char *, const char *> aCases[] = {
      {"idl_envi_env", "HEADER_INFO"},     {"IDL_ENVI_ENV ", "HEADER_INFO"},  {"OTHER", "HEADER_INFO"},
      {"", "HEADER_INFO"},                 {"IDL_ENVI_ENV", "PARAMETERS_INFO"}, {"IDL_ENVI_ENV", "idl_envi_env"},
      {"IDL_ENVI_ENV", "header_info"},     {nullptr, "HEADER_INFO"}};
  for (const auto &[aEnvironment, aRoot] : aCases) {
    SCOPED_TRACE(std::string(aEnvironment != nullptr ? aEnvironment : "none") + " in " + aRoot);
    const std::string aFile = temporalFile(aEnvironment, aRoot);
    EXPECT_FALSE(init(aFile));
    std::string aMessage;
    EXPECT_EQ(load(aFile, {"MAIN_CMD"}, &aMessage), CTLRX_ERR_PARAMETER_FILE);
    EXPECT_EQ(aMessage, aFile);
  }
  EXPECT_NE(tlrxReadFile(mDir.file("Process.log"))
                .find("\nError occour during initialization XML input parameter: [" + mDir.file("temporal.xml") + "]"),
            std::string::npos);
}

TEST_F(SchemaTest, UnreadableParameterFilesAndSchemaProblemsFailTheInitialisation) {
  const std::string aBroken = mDir.file("broken.xml");
  tlrxWriteFile(aBroken, "<HEADER_INFO><MAIN_CMD></HEADER_INFO>\n");
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { init(aBroken); }, &aMessage), CTLRX_ERR_FILE_PARSE);
  EXPECT_EQ(aMessage, aBroken);
  EXPECT_EQ(tlrxCodeOf([&] { init(mDir.file("missing.xml")); }), CTLRX_ERR_FILE_PARSE);
  const std::string aFile = temporalFile("IDL_ENVI_ENV");
  EXPECT_FALSE(init(aFile, {"MAIN_CMD"}, "NO_SUCH_SCHEMA"));
  EXPECT_FALSE(init(aFile, {"MAIN_CMD", "FLAT_CMD"}));
  EXPECT_EQ(load(aFile, {"MAIN_CMD", "FLAT_CMD"}), CTLRX_ERR_PARAMETER_FILE);
  fdfDeleteEnvironment(); // without the schema folder setting nothing is declared
  EXPECT_FALSE(init(aFile));
}

TEST_F(SchemaTest, CoherenceFileWithoutFlatSectionInitialises) {
  const std::string aFile = mDir.file("coherence.xml");
  tlrxWriteFile(aFile, "<HEADER_INFO><COREGISTRATION_CMD><cc_number_coeff_range>3</cc_number_coeff_range>"
                       "<cc_SNR_threshold>2.5</cc_SNR_threshold></COREGISTRATION_CMD><MAIN_CMD>\n"
                       "<in_master_file_name>/d/m_slc</in_master_file_name><rg_looks>1</rg_looks>"
                       "<TellurixEnvironment>IDL_ENVI_ENV</TellurixEnvironment></MAIN_CMD>\n"
                       "<INTERF_CMD><int_blocksize>5000</int_blocksize></INTERF_CMD></HEADER_INFO>\n");
  ASSERT_TRUE(init(aFile, {"COREGISTRATION_CMD", "MAIN_CMD", "INTERF_CMD", "FLAT_CMD"},
                   "PARAMETERS_INFO_MAIN_FE_COHERENCE_CMD"));
  EXPECT_STREQ(mParameters.getSection(3)->getName(), "FLAT_CMD");
  EXPECT_EQ(mParameters.getField("INTERF_CMD.int_blocksize").getInteger(), 5000);
  EXPECT_EQ(mParameters.getField("COREGISTRATION_CMD.cc_SNR_threshold").getDouble(), 2.5);
  EXPECT_STREQ(mParameters.getField("MAIN_CMD.rg_looks").getString(), "1");
  EXPECT_FALSE(mParameters.getSection(3)->holdsValue());
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { mParameters.getFieldWithValue("FLAT_CMD.in_dem_file_name"); }, &aMessage),
            CTLRX_ERR_DS_FIELD_MISSING);
  EXPECT_EQ(aMessage, "FLAT_CMD.in_dem_file_name");
}

TEST_F(SchemaTest, StandardHeaderRoundTripsThroughTheRasterOrHeaderName) {
  const std::string aRaster = mDir.file("scene_cc");
  CDescription aHeader, aRead, aAgain;
  fdfDeclareStandardHeader(aHeader);
  aHeader.getField("RasterInfo.NrOfLinesPerImage").setInteger(12);
  aHeader.getField("RasterInfo.CellType").setString("FLOAT");
  aHeader.getField("RasterInfo.NullCellValue").setDouble(-9999.0);
  aHeader.getField("RasterInfo.TiffLUTRed").allocate(1, 3);
  aHeader.getField("RasterInfo.TiffLUTRed").setInteger(2, 255);
  aHeader.getField("StateVectorData.StateVectorData").setNumberOfElements(2);
  aHeader.getField("StateVectorData.PosZ").setDouble(1, 7000000.5);
  ASSERT_TRUE(fdfWriteStandardHeader(aRaster.c_str(), aHeader, true));
  EXPECT_TRUE(tlrxFileExists(aRaster + ".sml"));
  fdfReadStandardHeader(aRaster.c_str(), aRead);
  EXPECT_EQ(aRead.getSectionCount(), 21);
  EXPECT_EQ(aRead.getField("RasterInfo.NrOfLinesPerImage").getInteger(), 12);
  EXPECT_STREQ(aRead.getField("CellType").getString(), "FLOAT");
  EXPECT_EQ(aRead.getField("NullCellValue").getDouble(), -9999.0);
  EXPECT_EQ(aRead.getField("RasterInfo.TiffLUTRed").getInteger(2), 255);
  EXPECT_EQ(aRead.getField("StateVectorData.StateVectorData").getNumberOfElements(), 2);
  EXPECT_EQ(aRead.getField("StateVectorData.PosZ").getDouble(1), 7000000.5);
  fdfReadStandardHeader((aRaster + "_hdr").c_str(), aAgain);
  EXPECT_EQ(aAgain.getField("RasterInfo.NrOfLinesPerImage").getInteger(), 12);
  // An orbit header name is used unchanged.
  aHeader.getField("StateVectorData.NrOfStateVectors").setInteger(5);
  ASSERT_TRUE(aHeader.writeXML(mDir.file("pass_orb_hdr").c_str(), true, true));
  fdfReadStandardHeader(mDir.file("pass_orb_hdr").c_str(), aRead);
  EXPECT_EQ(aRead.getField("StateVectorData.NrOfStateVectors").getInteger(), 5);
}

// A missing header raises 261122 naming it; an unreadable one says why.
TEST_F(SchemaTest, MissingUnreadableOrUnwritableHeadersRaiseTheirFileErrors) {
  CDescription aHeader;
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { fdfReadStandardHeader(mDir.file("absent").c_str(), aHeader); }, &aMessage),
            CTLRX_ERR_FILE_OPEN);
  EXPECT_EQ(aMessage, mDir.file("absent_hdr"));
  tlrxWriteFile(mDir.file("tag.sml"), "<HEADER_INFO>\n<RasterInfo>\n</Raster>\n");
  EXPECT_EQ(tlrxCodeOf([&] { fdfReadStandardHeader(mDir.file("tag").c_str(), aHeader); }, &aMessage),
            CTLRX_ERR_FILE_OPEN);
  EXPECT_EQ(aMessage, "mismatched tag at line 3 of " + mDir.file("tag.sml"));
  // The XML form alone: the ENVI companion has failures of its own.
  aHeader.getField("RasterInfo.NrOfLinesPerImage").setInteger(1);
  const TLRXEnviHeaderWriter aEnvi = fdfSetEnviHeaderWriter(nullptr);
  const std::string aNowhere = mDir.file("no_dir/raster");
  EXPECT_FALSE(fdfWriteStandardHeader(aNowhere.c_str(), aHeader));
  const int32_t aCode = tlrxCodeOf([&] { fdfWriteStandardHeader(aNowhere.c_str(), aHeader, true); }, &aMessage);
  fdfSetEnviHeaderWriter(aEnvi);
  EXPECT_EQ(aCode, CTLRX_ERR_FILE_WRITE);
  EXPECT_EQ(aMessage, aNowhere);
}
