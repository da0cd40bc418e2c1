// Description model: typed access and its check order, holding a value,
// structs, assignment and copies, dotted keys, dumps, key files, mandatory
// files, the scratch-buffer pool and the typed reads of header numbers.
#include "tlrx_description_test_support.h"
#include "tlrx_enviroment.h"
#include "tlrx_header_numbers.h"
#include "tlrx_standard_header.h"

#include <functional>
#include <limits>

namespace {

class DescriptionTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }
  std::string keyPath() const { return mDir.file("test.key"); }
  // Section declared from a key file written for the test.
  std::unique_ptr<CDescriptionSection> declare(const std::string &theText, const char *theName = "Sec") {
    tlrxWriteFile(keyPath(), theText);
    auto aSection = std::make_unique<CDescriptionSection>();
    EXPECT_TRUE(aSection->declareFromKeyFile(keyPath().c_str(), theName));
    return aSection;
  }
  // Code and message of declaring theName from theText.
  int32_t declareCode(const std::string &theText, std::string *theMessage = nullptr, const char *theName = "Sec") {
    tlrxWriteFile(keyPath(), theText);
    CDescriptionSection aSection;
    return tlrxCodeOf([&] { aSection.declareFromKeyFile(keyPath().c_str(), theName); }, theMessage);
  }
};

using TLRXField = CDescriptionField;

enum class EAccessor { kInteger, kIntegerOr, kSize, kReal, kRealOr, kFinite, kNull };

struct SNumberCase {
  const char *mKey;
  const char *mText; // stored as the field's type reads it; nullptr leaves it unset
  EAccessor mAccessor;
  double mValue;
  const char *mError; // message of 848642, nullptr when the value is read
};

const double sNaN = std::nan("");

double read(const CDescription &theHeader, const SNumberCase &theCase, const SHeaderReader &theReader = {}) {
  switch (theCase.mAccessor) {
  case EAccessor::kInteger: return fdfHeaderInteger(theHeader, theCase.mKey, theReader);
  case EAccessor::kIntegerOr: return fdfHeaderIntegerOr(theHeader, theCase.mKey, -1, theReader);
  case EAccessor::kSize: return fdfHeaderSize(theHeader, theCase.mKey, 900000, theReader);
  case EAccessor::kReal: return fdfHeaderReal(theHeader, theCase.mKey, theReader);
  case EAccessor::kRealOr: return fdfHeaderRealOr(theHeader, theCase.mKey, -1.0, theReader);
  case EAccessor::kFinite: return fdfHeaderFiniteReal(theHeader, theCase.mKey, theReader);
  case EAccessor::kNull: return fdfHeaderNullValue(theHeader, theReader);
  }
  return 0.0;
}

} // namespace

TEST_F(DescriptionTest, ScalarsHoldNoValueUntilSetConvertAndNameThemselves) {
  TLRXField aField("Count", CTLRX_DS_SCALAR, CTLRX_DS_INTEGER);
  EXPECT_FALSE(aField.holdsValue());
  EXPECT_EQ(std::make_pair(aField.getRowNbr(), aField.getColNbr()), std::make_pair(1, 1));
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { aField.getInteger(); }, &aMessage), CTLRX_ERR_DS_NOT_SET);
  EXPECT_EQ(aMessage, "Count");
  aField.setInteger(5);
  EXPECT_TRUE(aField.holdsValue());
  EXPECT_TRUE(aField.isSet());
  EXPECT_EQ(aField.getInteger(), 5);
  TLRXField aNameless(nullptr, CTLRX_DS_SCALAR, CTLRX_DS_DOUBLE);
  EXPECT_STREQ(aNameless.getName(), "Not initialised");
  aNameless.setDouble(1.0);
  EXPECT_EQ(aNameless.dumpText(), "");
  EXPECT_EQ(tlrxCodeOf([&] { aNameless.getString(); }, &aMessage), CTLRX_ERR_DS_TYPE);
  EXPECT_EQ(aMessage, "Not initialised");
  TLRXField aInt("I", CTLRX_DS_SCALAR, CTLRX_DS_INTEGER), aDouble("D", CTLRX_DS_SCALAR, CTLRX_DS_DOUBLE);
  TLRXField aText("S", CTLRX_DS_SCALAR, CTLRX_DS_STRING);
  aInt = 7;
  aDouble = 2.5;
  aText = "abc";
  EXPECT_EQ(static_cast<int32_t>(aInt), 7);
  EXPECT_EQ(static_cast<double>(aDouble), 2.5);
  EXPECT_EQ(static_cast<std::string>(aText), "abc");
  aText = std::string("def");
  EXPECT_STREQ(aText.getString(), "def");
  EXPECT_EQ(tlrxCodeOf([&] { aInt = 1.5; }), CTLRX_ERR_DS_TYPE);
  aText.setString(nullptr);
  EXPECT_STREQ(aText.getString(), "");
  // Stored strings are copies owned by the field.
  char aBuffer[8] = "one";
  aText.setString(aBuffer);
  std::snprintf(aBuffer, sizeof(aBuffer), "two");
  EXPECT_STREQ(aText.getString(), "one");
}

// Each accessor checks type, set flag and bounds in its own order.
TEST_F(DescriptionTest, AccessorsCheckTypeSetFlagAndBoundsInTheirOwnOrder) {
  TLRXField aD("D", CTLRX_DS_SCALAR, CTLRX_DS_DOUBLE), aS("S", CTLRX_DS_SCALAR, CTLRX_DS_STRING);
  TLRXField aOne("One", CTLRX_DS_SCALAR, CTLRX_DS_INTEGER), aVI("Counts", CTLRX_DS_VECTOR, CTLRX_DS_INTEGER);
  TLRXField aVD("Values", CTLRX_DS_VECTOR, CTLRX_DS_DOUBLE), aVS("Names", CTLRX_DS_VECTOR, CTLRX_DS_STRING);
  TLRXField aMD("MD", CTLRX_DS_MATRIX, CTLRX_DS_DOUBLE), aMI("MI", CTLRX_DS_MATRIX, CTLRX_DS_INTEGER);
  TLRXField aMS("MS", CTLRX_DS_MATRIX, CTLRX_DS_STRING), aNoMatrix("M", CTLRX_DS_MATRIX, CTLRX_DS_INTEGER);
  TLRXField aNoVector("Empty", CTLRX_DS_VECTOR, CTLRX_DS_INTEGER);
  TLRXField aPulseI("PulseDuration", CTLRX_DS_VECTOR, CTLRX_DS_INTEGER);
  aOne.setInteger(8);
  aVI.allocate(1, 3);
  aVI.setInteger(1, 4);
  aVD.allocate(1, 3);
  aVD.setDouble(0, 1.0);
  aVS.allocate(1, 2);
  aVS.setString(0, "first");
  aMD.allocate(2, 3);
  aMI.allocate(2, 2);
  aMS.allocate(1, 2);
  aPulseI.allocate(1, 2);
  const std::pair<int32_t, std::vector<std::function<void()>>> aRaising[] = {
      {CTLRX_ERR_DS_TYPE,
       {[&] { aD.getInteger(); }, [&] { aS.getDouble(); }, [&] { aD.getString(); }, [&] { aVD.getInteger(9); },
        [&] { aOne.getInteger(1); }, [&] { aPulseI.getDouble(5); }, [&] { aD.getDouble(1); },
        [&] { aMD.getDouble(1); }, [&] { aMD.getInteger(0, 0); }, [&] { aMI.getDouble(5, 5); },
        [&] { aVI.getString(7); }, [&] { aVI.setDouble(0, 1, 1.0); }, [&] { aVD.isSet(); }, [&] { aD.isSet(1); },
        [&] { aMD.isSet(1); }}},
      {CTLRX_ERR_DS_NOT_SET,
       {[&] { aD.getDouble(); }, [&] { aS.getString(); }, [&] { aMI.getString(0, 0); }, [&] { aMS.getString(0, 1); },
        [&] { aMS.getString(4, 4); }, [&] { aVS.getString(1); }, [&] { aVS.getString(2); }}},
      {CTLRX_ERR_DS_RANGE,
       {[&] { aVI.getInteger(3); }, [&] { aVI.getInteger(-1); }, [&] { aNoMatrix.getInteger(0); },
        [&] { aMD.getDouble(2, 0); }, [&] { aMD.getDouble(0, 3); }, [&] { aMD.getInteger(5, 5); },
        [&] { aVI.setDouble(5, 0, 1.0); }, [&] { aVI.setInteger(3, 1); }, [&] { aVI.setInteger(-1, 1); },
        [&] { aNoVector.setString(0, "x"); }, [&] { aNoVector.setInteger(0, 1); }, [&] { aVS.unset(2); }}}};
  for (const auto &[aCode, aCalls] : aRaising)
    for (size_t i = 0; i < aCalls.size(); ++i)
      EXPECT_EQ(tlrxCodeOf(aCalls[i]), aCode) << "call " << i << " of those raising " << aCode;
  // Unset cells read as stored, scalars through index 0.
  EXPECT_EQ(aVI.getInteger(0), 0);
  EXPECT_EQ(aVI.getInteger(1), 4);
  EXPECT_EQ(aOne.getInteger(0), 8);
  EXPECT_EQ(aMD.getDouble(1, 2), 0.0);
  EXPECT_STREQ(aVS.getString(0), "first");
  aVI.setInteger(2, 9);
  EXPECT_EQ(aVI.getInteger(2), 9);
  aMI.setInteger(0, 0, 3);
  EXPECT_EQ(tlrxCodeOf([&] { aMI.getString(0, 0); }), CTLRX_ERR_DS_TYPE); // set flag first, then type
  aMS.setString(0, 1, "v");
  EXPECT_STREQ(aMS.getString(0, 1), "v");
  // isSet answers false outside the storage.
  EXPECT_TRUE(aVD.isSet(0));
  EXPECT_FALSE(aVD.isSet(1));
  EXPECT_FALSE(aVD.isSet(3));
  EXPECT_FALSE(aVD.isSet(0, 5));
  EXPECT_FALSE(aVD.isSet(-1, 0));
  EXPECT_FALSE(aNoMatrix.isSet(0, 0));
  aVS.setString(1, "x");
  aVS.unset(1);
  EXPECT_FALSE(aVS.isSet(1));
  EXPECT_EQ(tlrxCodeOf([&] { aVS.getString(1); }), CTLRX_ERR_DS_NOT_SET);
  aD.setDouble(1.0);
  aD.unset();
  EXPECT_FALSE(aD.holdsValue());
  aD.release();
  EXPECT_EQ(tlrxCodeOf([&] { aD.isSet(); }), CTLRX_ERR_DS_CHECK);
  // getDouble beyond the end substitutes -9999, except for pulse durations.
  TLRXField aPlain("ChirpRate", CTLRX_DS_VECTOR, CTLRX_DS_DOUBLE);
  aPlain.allocate(1, 2);
  aPlain.setDouble(1, 0.25);
  EXPECT_EQ(aPlain.getDouble(1), 0.25);
  EXPECT_EQ(aPlain.getDouble(2), -9999.0);
  EXPECT_EQ(aPlain.getDouble(-1), -9999.0);
  for (const char *aName : {"PulseDuration", "MasterPulseDurationSeconds"}) {
    TLRXField aPulse(aName, CTLRX_DS_VECTOR, CTLRX_DS_DOUBLE);
    aPulse.allocate(1, 2);
    EXPECT_EQ(aPulse.getDouble(1), 0.0);
    std::string aMessage;
    EXPECT_EQ(tlrxCodeOf([&] { aPulse.getDouble(2); }, &aMessage), CTLRX_ERR_DS_RANGE) << aName;
    EXPECT_EQ(aMessage, aName);
  }
}

TEST_F(DescriptionTest, StorageMakesAVectorHoldAValueClearDropsItButKeepsAScalarsStorage) {
  TLRXField aVector("V", CTLRX_DS_VECTOR, CTLRX_DS_DOUBLE);
  EXPECT_FALSE(aVector.holdsValue());
  aVector.allocate(1, 0);
  EXPECT_FALSE(aVector.holdsValue());
  aVector.allocate(1, 4);
  EXPECT_TRUE(aVector.holdsValue()); // storage alone makes a vector present
  EXPECT_EQ(aVector.getNumberOfElements(), 4);
  aVector.clear();
  EXPECT_EQ(std::make_pair(aVector.getRowNbr(), aVector.getColNbr()), std::make_pair(0, 0));
  EXPECT_FALSE(aVector.holdsValue());
  EXPECT_EQ(tlrxCodeOf([&] { aVector.setDouble(0, 1.0); }), CTLRX_ERR_DS_RANGE);
  TLRXField aScalar("S", CTLRX_DS_SCALAR, CTLRX_DS_STRING);
  aScalar.setString("a");
  aScalar.clear();
  EXPECT_FALSE(aScalar.holdsValue());
  EXPECT_EQ(aScalar.getRowNbr(), 1);
  aScalar.setString("b");
  EXPECT_STREQ(aScalar.getString(), "b");
  // Allocation refuses structs, unknown types and unusable counts (a product beyond 32 bits too).
  TLRXField aStruct("Orbit", CTLRX_DS_MULTIPLE, CTLRX_DS_FIELD_POINTER), aInts("V", CTLRX_DS_VECTOR, CTLRX_DS_INTEGER);
  TLRXField aUnknown("U", CTLRX_DS_VECTOR, CTLRX_DS_UNRECOGNISED);
  EXPECT_EQ(tlrxCodeOf([&] { aStruct.allocate(1, 3); }), CTLRX_ERR_DS_TYPE);
  EXPECT_EQ(tlrxCodeOf([&] { aUnknown.allocate(1, 1); }), CTLRX_ERR_DS_TYPE);
  EXPECT_EQ(tlrxCodeOf([&] { aInts.allocate(-1, 3); }), CTLRX_ERR_DS_RANGE);
  EXPECT_EQ(tlrxCodeOf([&] { aInts.allocate(1, -3); }), CTLRX_ERR_DS_RANGE);
  EXPECT_EQ(tlrxCodeOf([&] { aInts.allocate(INT32_MAX, INT32_MAX); }), CTLRX_ERR_DS_RANGE);
}

TEST_F(DescriptionTest, StructHoldsAValueOnlyWhenEveryMemberDoesAndAssignmentCopiesSetCells) {
  auto aSection = declare("[Sec]\nOrbit = 3VD x y z\n");
  CDescriptionField *aStruct = aSection->getField(0);
  EXPECT_FALSE(aStruct->holdsValue());
  EXPECT_EQ(aStruct->getNumberOfElements(), 0);
  aSection->getField(1)->allocate(1, 2);
  aSection->getField(2)->allocate(1, 2);
  EXPECT_FALSE(aStruct->holdsValue());
  aStruct->setNumberOfElements(10);
  EXPECT_TRUE(aStruct->holdsValue());
  for (int32_t i = 0; i < 3; ++i) {
    EXPECT_EQ(aStruct->getMember(i)->getColNbr(), 10);
    EXPECT_EQ(aStruct->getMember(i), aSection->getField(i + 1));
  }
  EXPECT_EQ(aStruct->getNumberOfElements(), 10);
  EXPECT_EQ(aStruct->dumpText(), "[Orbit]  [MULTIPLE]  [Field Of Section pointer]  [Number of sub fiels : 3]\n");
  // An element of the struct is set when every member's element is.
  aSection->getField(1)->setDouble(4, 1.0);
  aSection->getField(2)->setDouble(4, 2.0);
  EXPECT_FALSE(aStruct->isSet(4));
  aSection->getField(3)->setDouble(4, 3.0);
  EXPECT_TRUE(aStruct->isSet(4));
  EXPECT_FALSE(aStruct->isSet(10));
  // Assignment compares member counts only; members are copied as fields.
  auto aOther = declare("[Sec]\nOrbit = 3VD x y z\n");
  aOther->getField(0)->setNumberOfElements(2);
  EXPECT_TRUE(aStruct->assignFrom(*aOther->getField(0)));
  EXPECT_EQ(aSection->getField(1)->getColNbr(), 10);
  auto aSmaller = declare("[Sec]\nOrbit = 2VD x y\n");
  aSmaller->getField(0)->setNumberOfElements(2);
  EXPECT_EQ(tlrxCodeOf([&] { aStruct->assignFrom(*aSmaller->getField(0)); }), CTLRX_ERR_DS_TYPE);
  // A struct of scalars needs every member set and has no element count.
  auto aCorner = declare("[Sec]\nCorner = 2D lat lon\n");
  aCorner->getField(1)->setDouble(1.0);
  EXPECT_FALSE(aCorner->getField(0)->holdsValue());
  aCorner->getField(2)->setDouble(2.0);
  EXPECT_TRUE(aCorner->getField(0)->holdsValue());
  EXPECT_EQ(tlrxCodeOf([&] { aCorner->getField(0)->setNumberOfElements(3); }), CTLRX_ERR_DS_TYPE);
  // Assignment copies set cells only; an empty source leaves the target alone.
  TLRXField aSource("V", CTLRX_DS_VECTOR, CTLRX_DS_STRING), aTarget("V", CTLRX_DS_VECTOR, CTLRX_DS_STRING);
  aSource.allocate(1, 3);
  aSource.setString(0, "a");
  aSource.setString(2, "c");
  EXPECT_TRUE(aTarget.assignFrom(aSource));
  EXPECT_EQ(aTarget.getColNbr(), 3);
  EXPECT_STREQ(aTarget.getString(0), "a");
  EXPECT_FALSE(aTarget.isSet(1));
  EXPECT_STREQ(aTarget.getString(2), "c");
  aSource.setString(0, "changed");
  EXPECT_STREQ(aTarget.getString(0), "a");
  TLRXField aEmpty("S", CTLRX_DS_SCALAR, CTLRX_DS_STRING), aDouble("T", CTLRX_DS_SCALAR, CTLRX_DS_DOUBLE);
  aDouble.setDouble(3.0);
  EXPECT_TRUE(aDouble.assignFrom(aEmpty)); // another type, but empty
  EXPECT_EQ(aDouble.getDouble(), 3.0);
  aEmpty.setString("x");
  EXPECT_EQ(tlrxCodeOf([&] { aDouble.assignFrom(aEmpty); }), CTLRX_ERR_DS_TYPE);
  EXPECT_EQ(aDouble.getDouble(), 3.0);
}

TEST_F(DescriptionTest, DumpShowsShapeCountsAndFirstValue) {
  TLRXField aVector("V", CTLRX_DS_VECTOR, CTLRX_DS_DOUBLE), aMatrix("M", CTLRX_DS_MATRIX, CTLRX_DS_STRING);
  aVector.allocate(1, 3);
  aVector.setDouble(0, 3.14159265);
  EXPECT_EQ(aVector.dumpText(), "[V]  [VECTOR]  [Double]  [Number of elements : 3]  =  3.14159\n");
  aMatrix.allocate(2, 2);
  aMatrix.setString(0, 0, "a");
  EXPECT_EQ(aMatrix.dumpText(), "[M]  [MARTIX]  [String]  [Row Nbr : 2]  [Col Nbr : 2]  =  [a]\n");
  TLRXField aInt("I", CTLRX_DS_SCALAR, CTLRX_DS_INTEGER), aOdd("W", 7, 9);
  aInt.setInteger(-12);
  EXPECT_EQ(aInt.dumpText(), "[I]  [SCALAR]  [Integer]  =  -12\n");
  EXPECT_EQ(aOdd.dumpText(), "[W]  [WRONG]  [WRONG] : EMPTY\n");
  EXPECT_STREQ(fdfShapeName(-1), "WRONG");
  EXPECT_STREQ(fdfValueTypeName(3), "Field Of Section pointer");
  // A description prints its sections and their fields.
  auto aSection = declare("[Sec]\na = I\nb = S\n");
  aSection->getField(0)->setInteger(4);
  CDescription aDescription;
  aDescription.addSection(std::move(aSection));
  EXPECT_EQ(aDescription.printText(true), "\n\n << Total number of Sections : 1 >>"
                                          "\n\n << [Sec]  -  Total number of Fields : 2 >>\n\n"
                                          "[a]  [SCALAR]  [Integer]  =  4\n[b]  [SCALAR]  [String] : EMPTY\n\n\n");
  EXPECT_EQ(aDescription.getSection(0)->printText(false),
            "\n\n << [Sec]  -  Total number of Fields : 2 >>\n\n[a]  [SCALAR]  [Integer]  =  4\n");
}

TEST_F(DescriptionTest, KeyFileDeclaresTypeCodesAndStructMembersAfterTheirStruct) {
  auto aSection = declare("; header comment\n[Sec]\nFirst = I\nOrbit = 3VD x y z ; positions\nLast = MS\n"
                          "a=I\nb = D\nc\t=\tF\nd = S\ne = VI\nf = VD(3)\ng = MI\nh = MF\n");
  ASSERT_EQ(aSection->getFieldCount(), 14);
  EXPECT_STREQ(aSection->getName(), "Sec");
  const CDescriptionField *aOrbit = aSection->getField(1);
  EXPECT_STREQ(aOrbit->getName(), "Orbit");
  EXPECT_EQ(aOrbit->getParentIndex(), -1);
  EXPECT_EQ(aOrbit->getMemberCount(), 3);
  for (int32_t i = 0; i < 3; ++i) {
    const CDescriptionField *aMember = aSection->getField(2 + i);
    EXPECT_EQ(aMember->getName(), std::string(1, static_cast<char>('x' + i)));
    EXPECT_EQ(aMember->getParentIndex(), 1);
    EXPECT_EQ(aOrbit->getMember(i), aMember);
  }
  const int32_t aExpected[][2] = {{0, 0}, {3, 3}, {1, 1}, {1, 1}, {1, 1}, {2, 2}, {0, 0},
                                  {0, 1}, {0, 1}, {0, 2}, {1, 0}, {1, 1}, {2, 0}, {2, 1}};
  for (int32_t i = 0; i < 14; ++i) {
    EXPECT_EQ(aSection->getField(i)->getShape(), aExpected[i][0]) << i;
    EXPECT_EQ(aSection->getField(i)->getValueType(), aExpected[i][1]) << i;
  }
  EXPECT_EQ(aSection->getField(14), nullptr);
}

// The header opens in the first two characters, the section runs to the end
// of the file; an over-long line is cut (its tail is no line of its own); a
// huge struct count is refused before it sizes anything.
TEST_F(DescriptionTest, KeyFileLinesDecideTheFieldsOfTheSection) {
  std::vector<std::string> aMany;
  auto aFields = [&aMany](int theCount) {
    std::string aText = "[Sec]\n";
    aMany.clear();
    for (int i = 0; i < theCount; ++i) {
      aMany.push_back("f" + std::to_string(i));
      aText += aMany.back() + " = D\n";
    }
    return aText;
  };
  std::string aNul = "[Sec]\na = I";
  aNul += '\0';
  const struct {
    std::string mText;
    int32_t mCode; // -1: nothing declared, no error
    std::vector<std::string> mNames;
    const char *mMessage;
  } aCases[] = {{"[Other]\nq = I\n[Sec]\nv = D\n", 0, {"v"}, nullptr},
                {"[Other]\nq = I\n [Sec]\nv = D\n", 0, {"v"}, nullptr},
                {"[Other]\nq = I\n[ Sec ]\nv = D\n", 0, {"v"}, nullptr},
                {"[Other]\nq = I\n\t[Sec]\nv = D\n", 0, {"v"}, nullptr},
                {"  [Sec]\nv = D\n", -1, {}, nullptr},
                {"[Sec]\na = I\n[Next]\nb = D\n", 0, {"a", "b"}, nullptr},
                {"[Sec]\nA = I ;" + std::string(1500000, 'x') + " Ghost = I\nB = D\n", 0, {"A", "B"}, nullptr},
                {aNul + " junk\nb = D\n", 0, {"a", "b"}, nullptr},
                {"[Sec]\nOrbit = 3VD x y ; z forgotten\n", CTLRX_ERR_DS_DECLARATION, {}, nullptr},
                {aFields(CTLRX_DS_MAX_NBR_FIELDS), CTLRX_ERR_DS_DECLARATION, {}, "Sec"},
                {aFields(5046) + "S = 3VD a b c\n", CTLRX_ERR_DS_DECLARATION, {}, nullptr},
                {"[Sec]\nS = 99999999999999999999VD a\n", CTLRX_ERR_DS_DECLARATION, {}, nullptr},
                {aFields(CTLRX_DS_MAX_NBR_FIELDS - 1), 0, aMany, nullptr}};
  for (const auto &aCase : aCases) {
    SCOPED_TRACE(aCase.mText.substr(0, 40));
    tlrxWriteFile(keyPath(), aCase.mText);
    CDescriptionSection aSection;
    bool aDeclared = false;
    std::string aMessage;
    EXPECT_EQ(tlrxCodeOf([&] { aDeclared = aSection.declareFromKeyFile(keyPath().c_str(), "Sec"); }, &aMessage),
              std::max(aCase.mCode, 0));
    EXPECT_EQ(aDeclared, aCase.mCode == 0);
    std::vector<std::string> aNames;
    for (int32_t i = 0; i < aSection.getFieldCount() && aCase.mCode == 0; ++i)
      aNames.push_back(aSection.getField(i)->getName());
    EXPECT_EQ(aNames, aCase.mNames);
    if (aCase.mMessage != nullptr)
      EXPECT_EQ(aMessage, aCase.mMessage);
  }
  for (const char *aLine : {"x = VX", "x = vd", "x = DV", "x = V", "x = ", "x = -3VD a b c", "x = VDD"}) {
    std::string aMessage;
    EXPECT_EQ(declareCode(std::string("[Sec]\nok = I\n") + aLine + "\n", &aMessage), CTLRX_ERR_DS_TYPE) << aLine;
    EXPECT_EQ(aMessage, "Sec");
  }
  EXPECT_EQ(fdfScratchBuffersInUse(), 0);
}

TEST_F(DescriptionTest, KeyFileNamesItsSectionIsFoundOrRaisesAndRedeclaresFromScratch) {
  CDescriptionSection aSection;
  EXPECT_EQ(tlrxCodeOf([&] { aSection.declareFromKeyFile(nullptr, nullptr); }), CTLRX_ERR_DS_DECLARATION);
  std::string aMessage;
  const std::string aMissing = mDir.file("missing.key");
  EXPECT_EQ(tlrxCodeOf([&] { aSection.declareFromKeyFile(aMissing.c_str(), "Sec"); }, &aMessage), CTLRX_ERR_FILE_OPEN);
  EXPECT_EQ(aMessage, aMissing);
  EXPECT_EQ(tlrxCodeOf([&] { aSection.declareFromKeyFile(nullptr, "NoSuchSection"); }, &aMessage), CTLRX_ERR_FILE_OPEN);
  EXPECT_EQ(aMessage, fdfGetRequiredEnvVar("TELLURIX_KEY_FILES_DIR") + "NoSuchSection.key");
  // A "_hdr" key file name falls back to its ".sml" form.
  tlrxWriteFile(mDir.file("keys.sml"), "[Sec]\nv = D\n");
  EXPECT_TRUE(aSection.declareFromKeyFile(mDir.file("keys_hdr").c_str(), "Sec"));
  EXPECT_EQ(aSection.getFieldCount(), 1);
  // Without a name the first header names the section; redeclaring releases the old fields.
  tlrxWriteFile(keyPath(), "[First]\nc = S\n");
  EXPECT_TRUE(aSection.declareFromKeyFile(keyPath().c_str(), nullptr));
  EXPECT_STREQ(aSection.getName(), "First");
  EXPECT_EQ(aSection.getFieldCount(), 1);
  tlrxWriteFile(keyPath(), "[First]\na = I\nb = I\n");
  EXPECT_TRUE(aSection.declareFromKeyFile(keyPath().c_str(), "First"));
  EXPECT_EQ(aSection.getFieldCount(), 2);
}

TEST_F(DescriptionTest, ScratchPoolHas110SlotsAndReportsExhaustion) {
  std::vector<std::unique_ptr<CScratchBuffer>> aLeases;
  for (int i = 0; i < CTLRX_DS_POOL_SLOTS; ++i)
    aLeases.push_back(std::make_unique<CScratchBuffer>(16));
  EXPECT_EQ(fdfScratchBuffersInUse(), 110);
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([] { CScratchBuffer aOne(16); }, &aMessage), CTLRX_ERR_DS_RANGE);
  EXPECT_EQ(aMessage, "All pools are busy");
  EXPECT_EQ(declareCode("[Sec]\na = I\n"), CTLRX_ERR_DS_RANGE);
  aLeases.pop_back();
  EXPECT_EQ(declareCode("[Sec]\na = I\n"), 0);
  aLeases.clear();
  EXPECT_EQ(fdfScratchBuffersInUse(), 0);
  CScratchBuffer aBig(2000000);
  EXPECT_GE(aBig.capacity(), 2000000u);
}

TEST_F(DescriptionTest, DottedKeysSplitAtTheFirstDot) {
  CDescription aDescription;
  tlrxDeclare(aDescription, mDir.path(), "[A]\nb.c = I\nx = I\n", {"A"});
  tlrxDeclare(aDescription, mDir.path(), "[B]\nx = D\ny = D\n", {"B"});
  const CDescriptionSection &aA = *aDescription.getSection(0), &aB = *aDescription.getSection(1);
  EXPECT_EQ(aDescription.findField("A.b.c"), aA.getField(0));
  EXPECT_EQ(aDescription.findField("x"), aA.getField(1)); // first section wins
  EXPECT_EQ(aDescription.findField("B.x"), aB.getField(0));
  EXPECT_EQ(aDescription.findField("y"), aB.getField(1));
  for (const char *aKey : {"A.y", "C.x", ".x", "b.c"}) // only the named section
    EXPECT_EQ(aDescription.findField(aKey), nullptr) << aKey;
  EXPECT_EQ(aDescription.findSection("B"), &aB);
  EXPECT_EQ(aDescription.findSection("b"), nullptr);
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { aDescription.getField("A.missing"); }, &aMessage), CTLRX_ERR_DS_FIELD_MISSING);
  EXPECT_EQ(aMessage, "A.missing");
  // A declared field without a value is missing for the value accessor only.
  EXPECT_EQ(tlrxCodeOf([&] { aDescription.getField("B.y"); }), 0);
  EXPECT_EQ(tlrxCodeOf([&] { aDescription.getFieldWithValue("B.y"); }, &aMessage), CTLRX_ERR_DS_FIELD_MISSING);
  EXPECT_EQ(aMessage, "B.y");
  aDescription.getField("B.y").setDouble(1.0);
  EXPECT_EQ(aDescription.getFieldWithValue("B.y").getDouble(), 1.0);
}

TEST_F(DescriptionTest, CopyKeepsTheTargetScaleFactorsAndNeedsTheSameNameAndLayout) {
  CDescription aSource({"RasterInfo", "Processing"});
  CDescription aTarget({"RasterInfo"});
  aSource.getField("RasterInfo.NrOfLinesPerImage").setInteger(100);
  aSource.getField("RasterInfo.RealScaleFactor").setDouble(2.0);
  aSource.getField("RasterInfo.ImaginaryScaleFactor").setDouble(3.0);
  aSource.getField("RasterInfo.CellType").setString("FLOAT");
  aSource.getField("Processing.PixelSpacingRg").setDouble(7.9);
  aTarget.getField("RasterInfo.RealScaleFactor").setDouble(0.5);
  aTarget.getField("RasterInfo.DataUnits").setString("POWER");
  EXPECT_TRUE(aTarget.copyFrom(aSource, false));
  EXPECT_EQ(aTarget.getField("RasterInfo.NrOfLinesPerImage").getInteger(), 100);
  EXPECT_STREQ(aTarget.getField("RasterInfo.CellType").getString(), "FLOAT");
  EXPECT_EQ(aTarget.getField("RasterInfo.RealScaleFactor").getDouble(), 0.5);
  EXPECT_FALSE(aTarget.getField("RasterInfo.ImaginaryScaleFactor").holdsValue());
  EXPECT_STREQ(aTarget.getField("RasterInfo.DataUnits").getString(), "POWER"); // not held by the source
  EXPECT_EQ(aTarget.findSection("Processing"), nullptr);
  aTarget = aSource; // clears first
  EXPECT_FALSE(aTarget.getField("RasterInfo.DataUnits").holdsValue());
  EXPECT_FALSE(aTarget.getField("RasterInfo.RealScaleFactor").holdsValue());
  EXPECT_EQ(aTarget.getField("RasterInfo.NrOfLinesPerImage").getInteger(), 100);
  // Sections of another name or layout are not copied.
  auto aSmall = declare("[RasterInfo]\nNrOfLinesPerImage = I\n", "RasterInfo");
  CDescriptionSection aFull("RasterInfo");
  aSmall->getField(0)->setInteger(3);
  // Same name, fewer fields: a positional copy would read past the source.
  EXPECT_FALSE(aFull.copyValuesFrom(*aSmall));
  auto aOtherName = declare("[Other]\nNrOfLinesPerImage = I\n", "Other");
  auto aSameLayout = declare("[RasterInfo]\nNrOfLinesPerImage = I\n", "RasterInfo");
  EXPECT_FALSE(aSameLayout->copyValuesFrom(*aOtherName));
  EXPECT_TRUE(aSameLayout->copyValuesFrom(*aSmall));
  EXPECT_EQ(aSameLayout->getField(0)->getInteger(), 3);
  CDescription aNoFields;
  aNoFields.addSection(std::make_unique<CDescriptionSection>())->setName("RasterInfo");
  EXPECT_FALSE(aTarget.copyFrom(aNoFields, true));
  EXPECT_EQ(tlrxCodeOf([&] { aTarget = aNoFields; }), CTLRX_ERR_DS_DECLARATION);
  // Same layout, another value type at one position: the assignment raises.
  auto aTyped = declare("[RasterInfo]\nNrOfLinesPerImage = D\n", "RasterInfo");
  aTyped->getField(0)->setDouble(1.0);
  EXPECT_EQ(tlrxCodeOf([&] { aSameLayout->copyValuesFrom(*aTyped); }), CTLRX_ERR_DS_TYPE);
}

TEST_F(DescriptionTest, MandatoryCheckLogsEveryEmptyListedFieldOfTheFirstFailingSection) {
  CDescription aHeader({"RasterInfo", "Processing"});
  aHeader.getField("RasterInfo.NrOfLinesPerImage").setInteger(10);
  const std::string aMandatory = mDir.file("check.mandatory");
  tlrxWriteFile(aMandatory, "[RasterInfo]\nNrOfLinesPerImage\n \"NrOfPixelsPerLine\"\nCellType extra tokens\n"
                            "NotDeclaredHere\n[Processing]\nPixelSpacingRg\n");
  EXPECT_FALSE(aHeader.checkMandatory(aMandatory.c_str(), false));
  const std::string aLog = tlrxReadFile(mDir.file("Process.log"));
  EXPECT_NE(aLog.find("Mandatory Field [NrOfPixelsPerLine] is not found in [RasterInfo] section\n"), std::string::npos);
  EXPECT_NE(aLog.find("Mandatory Field [CellType] is not found in [RasterInfo] section\n"), std::string::npos);
  EXPECT_EQ(aLog.find("NotDeclaredHere"), std::string::npos);
  EXPECT_EQ(aLog.find("[PixelSpacingRg]"), std::string::npos);
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { aHeader.checkMandatory(aMandatory.c_str(), true); }, &aMessage), CTLRX_ERR_DS_CHECK);
  EXPECT_EQ(aMessage, aMandatory);
  aHeader.getField("RasterInfo.NrOfPixelsPerLine").setInteger(10);
  aHeader.getField("RasterInfo.CellType").setString("FLOAT");
  EXPECT_FALSE(aHeader.checkMandatory(aMandatory.c_str(), false)); // Processing now
  aHeader.getField("Processing.PixelSpacingRg").setDouble(1.0);
  EXPECT_TRUE(aHeader.checkMandatory(aMandatory.c_str(), true));
  // A bare name comes from the mandatory folder; without the file nothing can be verified.
  CDescription aStandard;
  fdfDeclareStandardHeader(aStandard);
  EXPECT_FALSE(aStandard.checkMandatory("StandardHeader", false));
  aStandard.getField("RasterInfo.NrOfLinesPerImage").setInteger(1);
  aStandard.getField("RasterInfo.NrOfPixelsPerLine").setInteger(1);
  aStandard.getField("RasterInfo.CellType").setString("FLOAT");
  EXPECT_TRUE(aStandard.checkMandatory("StandardHeader", false));
  EXPECT_FALSE(aStandard.checkMandatory("GeocodedHeader", false));
  EXPECT_FALSE(aStandard.checkMandatory("NoSuchList", false));
  EXPECT_EQ(tlrxCodeOf([&] { aStandard.checkMandatory("NoSuchList", true); }), CTLRX_ERR_DS_CHECK);
  EXPECT_EQ(fdfScratchBuffersInUse(), 0);
}

TEST_F(DescriptionTest, HeaderNumberAccessorsReadWholeNumbersAndNameTheFieldOfAnyOther) {
  CDescription aHeader;
  tlrxDeclare(aHeader, mDir.path(), "[RasterInfo]\nLines = I\nNullCellValue = D\nText = S\nVec = VD\n", {"RasterInfo"});
  auto aStore = [&aHeader](const SNumberCase &theCase) {
    aHeader.clearValues();
    CDescriptionField *aField = aHeader.findField(theCase.mKey);
    if (aField == nullptr || theCase.mText == nullptr)
      return;
    if (aField->getShape() != CTLRX_DS_SCALAR)
      aField->setNumberOfElements(1);
    if (aField->getValueType() == CTLRX_DS_STRING)
      aField->setString(theCase.mText);
    else
      fdfSetNumberFromText(*aField, 0, 0, theCase.mText);
  };
  const double aInf = std::numeric_limits<double>::infinity();
  const SNumberCase aCases[] = {
      {"RasterInfo.Lines", "7", EAccessor::kInteger, 7, nullptr},
      {"RasterInfo.Text", " -12", EAccessor::kInteger, -12, nullptr},
      {"RasterInfo.Text", "7abc", EAccessor::kInteger, 0, "RasterInfo.Text is not an integer [7abc]"},
      {"RasterInfo.Text", "7.9", EAccessor::kInteger, 0, "RasterInfo.Text is not an integer [7.9]"},
      {"RasterInfo.Text", "4294967303", EAccessor::kInteger, 0, "RasterInfo.Text is not an integer [4294967303]"},
      {"RasterInfo.NullCellValue", "7", EAccessor::kInteger, 7, nullptr},
      {"RasterInfo.NullCellValue", "7.5", EAccessor::kInteger, 0, "RasterInfo.NullCellValue is not an integer [7.5]"},
      {"RasterInfo.NullCellValue", "1e10", EAccessor::kInteger, 0,
       "RasterInfo.NullCellValue is not an integer [10000000000]"},
      {"RasterInfo.Lines", nullptr, EAccessor::kInteger, 0, "RasterInfo.Lines holds no value"},
      {"RasterInfo.Undeclared", nullptr, EAccessor::kInteger, 0, "RasterInfo.Undeclared holds no value"},
      {"RasterInfo.Vec", "1", EAccessor::kReal, 0, "RasterInfo.Vec is not a single value"},
      {"RasterInfo.Lines", nullptr, EAccessor::kIntegerOr, -1, nullptr},
      {"RasterInfo.Text", "2x", EAccessor::kIntegerOr, 0, "RasterInfo.Text is not an integer [2x]"},
      {"RasterInfo.Lines", "900000", EAccessor::kSize, 900000, nullptr},
      {"RasterInfo.Lines", "0", EAccessor::kSize, 0, "RasterInfo.Lines is not in 1 to 900000 [0]"},
      {"RasterInfo.Text", "900001", EAccessor::kSize, 0, "RasterInfo.Text is not in 1 to 900000 [900001]"},
      {"RasterInfo.Lines", "3", EAccessor::kReal, 3, nullptr},
      {"RasterInfo.Text", "-NaN", EAccessor::kReal, sNaN, nullptr},
      {"RasterInfo.Text", "nan(0x7)", EAccessor::kReal, sNaN, nullptr},
      {"RasterInfo.Text", "2.5e3", EAccessor::kReal, 2500, nullptr},
      {"RasterInfo.Text", "2.5 m", EAccessor::kReal, 0, "RasterInfo.Text is not a number [2.5 m]"},
      {"RasterInfo.Text", "1e999", EAccessor::kReal, 0, "RasterInfo.Text is not a number [1e999]"},
      {"RasterInfo.Text", "inf", EAccessor::kReal, aInf, nullptr},
      {"RasterInfo.Text", "inf", EAccessor::kFinite, 0, "RasterInfo.Text is not a finite number [inf]"},
      {"RasterInfo.NullCellValue", "NaN", EAccessor::kFinite, 0,
       "RasterInfo.NullCellValue is not a finite number [nan]"},
      {"RasterInfo.NullCellValue", "-2.5", EAccessor::kFinite, -2.5, nullptr},
      {"RasterInfo.NullCellValue", nullptr, EAccessor::kRealOr, -1, nullptr},
      {"RasterInfo.NullCellValue", nullptr, EAccessor::kNull, 0, nullptr},
      {"RasterInfo.NullCellValue", "NaN", EAccessor::kNull, sNaN, nullptr},
      {"RasterInfo.NullCellValue", "-9999", EAccessor::kNull, -9999, nullptr},
  };
  for (const SNumberCase &aCase : aCases) {
    SCOPED_TRACE(std::string(aCase.mKey) + " [" + (aCase.mText != nullptr ? aCase.mText : "unset") + "] accessor " +
                 std::to_string(static_cast<int>(aCase.mAccessor)));
    aStore(aCase);
    double aValue = 0.0;
    std::string aMessage;
    const int32_t aCode = tlrxCodeOf([&] { aValue = read(aHeader, aCase); }, &aMessage);
    EXPECT_EQ(aCode, aCase.mError == nullptr ? 0 : CTLRX_ERR_DS_FIELD_MISSING) << aMessage;
    if (aCase.mError == nullptr)
      EXPECT_TRUE(tlrxSameDouble(aValue, aCase.mValue)) << aValue;
    else
      EXPECT_EQ(aMessage, aCase.mError);
  }
  // A reader raises its own code, its file first.
  const SNumberCase aCase = {"RasterInfo.Text", "12 pixels", EAccessor::kSize, 0, nullptr};
  aStore(aCase);
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { read(aHeader, aCase, {261121, "out.hdr"}); }, &aMessage), 261121);
  EXPECT_EQ(aMessage, "out.hdr: RasterInfo.Text is not an integer [12 pixels]");
}
