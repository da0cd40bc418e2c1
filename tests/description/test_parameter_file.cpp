// Command parameter files (schema, XML file, environment check) and the
// standard header read and written for a raster.
#include "tlrx_description_section.h"
#include "tlrx_description_xml.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_generic_utility.h"
#include "tlrx_init_from_xml_schema.h"
#include "tlrx_standard_header.h"
#include "tlrx_description_test_support.h"
#include "tlrx_test_support.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace {

const char *const CTLRX_TEMPORAL_SCHEMA = "PARAMETERS_INFO_MT_FEAT_EXT_CMD";
const char *const CTLRX_COHERENCE_SCHEMA = "PARAMETERS_INFO_MAIN_FE_COHERENCE_CMD";
const std::vector<std::string> CTLRX_COHERENCE_SECTIONS = {"COREGISTRATION_CMD", "MAIN_CMD", "INTERF_CMD", "FLAT_CMD"};

class ParameterFileTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }

  std::string write(const std::string &theName, const std::string &theBody, const char *theRoot = "HEADER_INFO") {
    const std::string aPath = mDir.file(theName);
    tlrxWriteFile(aPath,
                  std::string("<?xml version=\"1.0\" ?>\n<") + theRoot + ">\n" + theBody + "</" + theRoot + ">\n");
    return aPath;
  }

  static std::string temporalMain(const char *theEnvironment) {
    std::string aText = "   <MAIN_CMD>\n"
                        "      <input_file_list>\n"
                        "         <VectorString NumberOfElements = \"2\">\n"
                        "            <ValueString ID = \"0\">/data/a</ValueString>\n"
                        "            <ValueString ID = \"1\">/data/b</ValueString>\n"
                        "         </VectorString>\n"
                        "      </input_file_list>\n"
                        "      <out_root_file_name>/data/out</out_root_file_name>\n"
                        "      <max_increment_thr_db>3.5</max_increment_thr_db>\n"
                        "      <mean>OK</mean>\n"
                        "      <std>ok</std>\n"
                        "      <median>Ok</median>\n";
    if (theEnvironment != nullptr) {
      aText += std::string("      <TellurixEnvironment>") + theEnvironment + "</TellurixEnvironment>\n";
    }
    return aText + "   </MAIN_CMD>\n";
  }
};

} // namespace

TEST_F(ParameterFileTest, TemporalParameterFileInitialisesAndSwitchesAreExact) {
  const std::string aFile = write("temporal.xml", temporalMain("IDL_ENVI_ENV"));
  CDescription aParameters;
  ASSERT_TRUE(fdfInitParameters(CTLRX_TEMPORAL_SCHEMA, {"MAIN_CMD"}, aFile.c_str(), aParameters));
  const CDescriptionField &aList = aParameters.getField("MAIN_CMD.input_file_list");
  ASSERT_EQ(aList.getNumberOfElements(), 2);
  EXPECT_STREQ(aList.getString(1), "/data/b");
  EXPECT_EQ(aParameters.getField("MAIN_CMD.max_increment_thr_db").getDouble(), 3.5);
  EXPECT_TRUE(fdfIsSwitchOn(aParameters.getField("MAIN_CMD.mean").getString()));
  EXPECT_FALSE(fdfIsSwitchOn(aParameters.getField("MAIN_CMD.std").getString()));
  EXPECT_FALSE(fdfIsSwitchOn(aParameters.getField("MAIN_CMD.median").getString()));
  // A setting the file lacks, and one read with the wrong type.
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { aParameters.getFieldWithValue("MAIN_CMD.gradient"); }, &aMessage), CTLRX_ERR_DS_FIELD_MISSING);
  EXPECT_EQ(aMessage, "MAIN_CMD.gradient");
  EXPECT_EQ(tlrxCodeOf([&] { aParameters.getField("MAIN_CMD.no_such_key"); }), CTLRX_ERR_DS_FIELD_MISSING);
  EXPECT_EQ(tlrxCodeOf([&] { aParameters.getField("MAIN_CMD.max_increment_thr_db").getString(); }), CTLRX_ERR_DS_TYPE);
  EXPECT_NO_THROW(fdfLoadCommandParameters(CTLRX_TEMPORAL_SCHEMA, {"MAIN_CMD"}, aFile.c_str(), aParameters));
}

TEST_F(ParameterFileTest, EnvironmentMustBeExactlyTheSupportedOne) {
  for (const char *aEnvironment : {"idl_envi_env", "IDL_ENVI_ENV ", "OTHER", ""}) {
    const std::string aFile = write("env.xml", temporalMain(aEnvironment));
    CDescription aParameters;
    EXPECT_FALSE(fdfInitParameters(CTLRX_TEMPORAL_SCHEMA, {"MAIN_CMD"}, aFile.c_str(), aParameters)) << aEnvironment;
  }
  // No environment at all is refused the same way, not as a missing value.
  const std::string aFile = write("none.xml", temporalMain(nullptr));
  CDescription aParameters;
  EXPECT_FALSE(fdfInitParameters(CTLRX_TEMPORAL_SCHEMA, {"MAIN_CMD"}, aFile.c_str(), aParameters));
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { fdfLoadCommandParameters(CTLRX_TEMPORAL_SCHEMA, {"MAIN_CMD"}, aFile.c_str(), aParameters); },
                   &aMessage),
            CTLRX_ERR_PARAMETER_FILE);
  EXPECT_EQ(aMessage, aFile);
  const std::string aLog = tlrxReadFile(mDir.file("Process.log"));
  EXPECT_NE(aLog.find("\nError occour during initialization XML input parameter: [" + aFile + "]"), std::string::npos);
}

TEST_F(ParameterFileTest, AnotherRootElementIsRejected) {
  for (const char *aRoot : {"PARAMETERS_INFO", "idl_envi_env", "header_info"}) {
    const std::string aFile = write("root.xml", temporalMain("IDL_ENVI_ENV"), aRoot);
    CDescription aParameters;
    EXPECT_FALSE(fdfInitParameters(CTLRX_TEMPORAL_SCHEMA, {"MAIN_CMD"}, aFile.c_str(), aParameters)) << aRoot;
    EXPECT_EQ(
        tlrxCodeOf([&] { fdfLoadCommandParameters(CTLRX_TEMPORAL_SCHEMA, {"MAIN_CMD"}, aFile.c_str(), aParameters); }),
        CTLRX_ERR_PARAMETER_FILE)
        << aRoot;
  }
}

TEST_F(ParameterFileTest, UnreadableParameterFileRaisesTheParseError) {
  const std::string aBroken = mDir.file("broken.xml");
  tlrxWriteFile(aBroken, "<HEADER_INFO><MAIN_CMD></HEADER_INFO>\n");
  CDescription aParameters;
  std::string aMessage;
  EXPECT_EQ(
      tlrxCodeOf([&] { fdfInitParameters(CTLRX_TEMPORAL_SCHEMA, {"MAIN_CMD"}, aBroken.c_str(), aParameters); }, &aMessage),
      CTLRX_ERR_FILE_PARSE);
  EXPECT_EQ(aMessage, aBroken);
  const std::string aMissing = mDir.file("missing.xml");
  EXPECT_EQ(tlrxCodeOf([&] { fdfInitParameters(CTLRX_TEMPORAL_SCHEMA, {"MAIN_CMD"}, aMissing.c_str(), aParameters); }),
            CTLRX_ERR_FILE_PARSE);
}

TEST_F(ParameterFileTest, SchemaProblemsFailTheInitialisation) {
  const std::string aFile = write("temporal.xml", temporalMain("IDL_ENVI_ENV"));
  CDescription aParameters;
  EXPECT_FALSE(fdfInitParameters("NO_SUCH_SCHEMA", {"MAIN_CMD"}, aFile.c_str(), aParameters));
  EXPECT_FALSE(fdfInitParameters(CTLRX_TEMPORAL_SCHEMA, {"MAIN_CMD", "FLAT_CMD"}, aFile.c_str(), aParameters));
  EXPECT_EQ(tlrxCodeOf([&] {
              fdfLoadCommandParameters(CTLRX_TEMPORAL_SCHEMA, {"MAIN_CMD", "FLAT_CMD"}, aFile.c_str(), aParameters);
            }),
            CTLRX_ERR_PARAMETER_FILE);
  // Without the schema directory setting nothing is declared.
  fdfDeleteEnvironment();
  EXPECT_FALSE(fdfInitParameters(CTLRX_TEMPORAL_SCHEMA, {"MAIN_CMD"}, aFile.c_str(), aParameters));
}

TEST_F(ParameterFileTest, CoherenceFileWithoutFlatSectionInitialises) {
  const std::string aFile = write("coherence.xml", "   <COREGISTRATION_CMD>\n"
                                                   "      <cc_number_coeff_range>3</cc_number_coeff_range>\n"
                                                   "      <cc_SNR_threshold>2.5</cc_SNR_threshold>\n"
                                                   "   </COREGISTRATION_CMD>\n"
                                                   "   <MAIN_CMD>\n"
                                                   "      <in_master_file_name>/d/m_slc</in_master_file_name>\n"
                                                   "      <rg_looks>1</rg_looks>\n"
                                                   "      <TellurixEnvironment>IDL_ENVI_ENV</TellurixEnvironment>\n"
                                                   "   </MAIN_CMD>\n"
                                                   "   <INTERF_CMD>\n"
                                                   "      <int_blocksize>5000</int_blocksize>\n"
                                                   "   </INTERF_CMD>\n");
  CDescription aParameters;
  ASSERT_TRUE(fdfInitParameters(CTLRX_COHERENCE_SCHEMA, CTLRX_COHERENCE_SECTIONS, aFile.c_str(), aParameters));
  EXPECT_STREQ(aParameters.getSection(3)->getName(), "FLAT_CMD");
  EXPECT_EQ(aParameters.getField("INTERF_CMD.int_blocksize").getInteger(), 5000);
  EXPECT_EQ(aParameters.getField("COREGISTRATION_CMD.cc_SNR_threshold").getDouble(), 2.5);
  EXPECT_STREQ(aParameters.getField("MAIN_CMD.rg_looks").getString(), "1");
  EXPECT_FALSE(aParameters.getSection(3)->holdsValue());
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { aParameters.getFieldWithValue("FLAT_CMD.in_dem_file_name"); }, &aMessage),
            CTLRX_ERR_DS_FIELD_MISSING);
  EXPECT_EQ(aMessage, "FLAT_CMD.in_dem_file_name");
}

// ------------------------------------------------------- standard header

TEST_F(ParameterFileTest, StandardHeaderRoundTripsThroughTheRasterName) {
  const std::string aRaster = mDir.file("scene_cc");
  CDescription aHeader;
  fdfDeclareStandardHeader(aHeader);
  aHeader.getField("RasterInfo.NrOfLinesPerImage").setInteger(12);
  aHeader.getField("RasterInfo.CellType").setString("FLOAT");
  aHeader.getField("RasterInfo.NullCellValue").setDouble(-9999.0);
  CDescriptionField &aLut = aHeader.getField("RasterInfo.TiffLUTRed");
  aLut.allocate(1, 3);
  aLut.setInteger(2, 255);
  CDescriptionField &aOrbit = aHeader.getField("StateVectorData.StateVectorData");
  aOrbit.setNumberOfElements(2);
  aHeader.getField("StateVectorData.PosZ").setDouble(1, 7000000.5);
  ASSERT_TRUE(fdfWriteStandardHeader(aRaster.c_str(), aHeader, true));
  EXPECT_TRUE(tlrxFileExists(aRaster + ".sml"));

  CDescription aRead;
  fdfReadStandardHeader(aRaster.c_str(), aRead);
  EXPECT_EQ(aRead.getSectionCount(), 21);
  EXPECT_EQ(aRead.getField("RasterInfo.NrOfLinesPerImage").getInteger(), 12);
  EXPECT_STREQ(aRead.getField("CellType").getString(), "FLOAT");
  EXPECT_EQ(aRead.getField("NullCellValue").getDouble(), -9999.0);
  EXPECT_EQ(aRead.getField("RasterInfo.TiffLUTRed").getInteger(2), 255);
  EXPECT_EQ(aRead.getField("StateVectorData.StateVectorData").getNumberOfElements(), 2);
  EXPECT_EQ(aRead.getField("StateVectorData.PosZ").getDouble(1), 7000000.5);
  // The header name itself is accepted as well.
  CDescription aAgain;
  fdfReadStandardHeader((aRaster + "_hdr").c_str(), aAgain);
  EXPECT_EQ(aAgain.getField("RasterInfo.NrOfLinesPerImage").getInteger(), 12);
}

TEST_F(ParameterFileTest, OrbitHeaderNameIsUsedUnchanged) {
  CDescription aHeader;
  fdfDeclareStandardHeader(aHeader);
  aHeader.getField("StateVectorData.NrOfStateVectors").setInteger(5);
  const std::string aOrbit = mDir.file("pass_orb_hdr");
  ASSERT_TRUE(aHeader.writeXML(aOrbit.c_str(), true, true));
  CDescription aRead;
  fdfReadStandardHeader(aOrbit.c_str(), aRead);
  EXPECT_EQ(aRead.getField("StateVectorData.NrOfStateVectors").getInteger(), 5);
}

TEST_F(ParameterFileTest, MissingOrUnwritableHeadersRaiseTheirFileErrors) {
  const std::string aRaster = mDir.file("absent");
  CDescription aHeader;
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { fdfReadStandardHeader(aRaster.c_str(), aHeader); }, &aMessage), CTLRX_ERR_FILE_OPEN);
  EXPECT_EQ(aMessage, aRaster + "_hdr");
  fdfDeclareStandardHeader(aHeader);
  aHeader.getField("RasterInfo.NrOfLinesPerImage").setInteger(1);
  // The XML form alone: the ENVI companion has failures of its own.
  const TLRXEnviHeaderWriter aEnvi = fdfSetEnviHeaderWriter(nullptr);
  const std::string aNowhere = mDir.file("no_dir/raster");
  EXPECT_FALSE(fdfWriteStandardHeader(aNowhere.c_str(), aHeader));
  const int32_t aCode = tlrxCodeOf([&] { fdfWriteStandardHeader(aNowhere.c_str(), aHeader, true); }, &aMessage);
  fdfSetEnviHeaderWriter(aEnvi);
  EXPECT_EQ(aCode, CTLRX_ERR_FILE_WRITE);
  EXPECT_EQ(aMessage, aNowhere);
}

// A header that exists but cannot be read keeps the code 261122, and its
// message says why instead of suggesting the file could not be opened.
TEST_F(ParameterFileTest, UnreadableHeadersSayWhyInTheMessage) {
  struct SCase {
    const char *mName;
    std::string mContent;
    std::string mMessage;
  } const aCases[] = {
      {"tag.sml", "<HEADER_INFO>\n<RasterInfo>\n</Raster>\n", "mismatched tag at line 3 of " + mDir.file("tag.sml")},
      {"cut.sml", "<HEADER_INFO>\n<RasterInfo>\n", "no element found at line 3 of " + mDir.file("cut.sml")},
      {"root.sml", "<OTHER>\n</OTHER>\n", "no root element HEADER_INFO in " + mDir.file("root.sml")},
      {"text_hdr", "[Sensor]\n", "section EnvisatDescriptionRecord not found in " + mDir.file("text_hdr")},
  };
  for (const SCase &aCase : aCases) {
    tlrxWriteFile(mDir.file(aCase.mName), aCase.mContent);
    const std::string aRaster = mDir.file(std::string(aCase.mName).substr(0, std::string(aCase.mName).find_first_of("._")));
    CDescription aHeader;
    std::string aMessage;
    EXPECT_EQ(tlrxCodeOf([&] { fdfReadStandardHeader(aRaster.c_str(), aHeader); }, &aMessage), CTLRX_ERR_FILE_OPEN)
        << aCase.mName;
    EXPECT_EQ(aMessage, aCase.mMessage);
  }
}
