// Description model: typed access and its check order, holding a value,
// structs, assignment and copies, dotted keys, dumps, key files, mandatory
// files and the scratch-buffer pool.
#include "tlrx_description_section.h"
#include "tlrx_enviroment.h"
#include "tlrx_errors.h"
#include "tlrx_standard_header.h"
#include "tlrx_description_test_support.h"
#include "tlrx_test_support.h"

#include <gtest/gtest.h>

#include <climits>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

namespace {

class DescriptionTest : public ::testing::Test {
protected:
  CTempDir mDir;
  void SetUp() override { tlrxStartLibraryEnvironment(mDir.path()); }

  // Section declared from a key file written for the test.
  std::unique_ptr<CDescriptionSection> declare(const std::string &theText, const char *theName = "Sec") {
    tlrxWriteFile(mDir.file("test.key"), theText);
    auto aSection = std::make_unique<CDescriptionSection>();
    EXPECT_TRUE(aSection->declareFromKeyFile(mDir.file("test.key").c_str(), theName));
    return aSection;
  }
  std::string keyPath() const { return mDir.file("test.key"); }
};

} // namespace

// ------------------------------------------------------------ scalar basics

TEST_F(DescriptionTest, NewScalarHoldsNoValueUntilSetAndDumpsItsValue) {
  CDescriptionField aField("Count", CTLRX_DS_SCALAR, CTLRX_DS_INTEGER);
  EXPECT_FALSE(aField.holdsValue());
  EXPECT_EQ(aField.getRowNbr(), 1);
  EXPECT_EQ(aField.getColNbr(), 1);
  EXPECT_EQ(aField.dumpText(), "[Count]  [SCALAR]  [Integer] : EMPTY\n");
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { aField.getInteger(); }, &aMessage), CTLRX_ERR_DS_NOT_SET);
  EXPECT_EQ(aMessage, "Count");
  aField.setInteger(5);
  EXPECT_TRUE(aField.holdsValue());
  EXPECT_TRUE(aField.isSet());
  EXPECT_EQ(aField.getInteger(), 5);
  EXPECT_EQ(aField.dumpText(), "[Count]  [SCALAR]  [Integer]  =  5\n");
}

TEST_F(DescriptionTest, NamelessFieldReportsNotInitialisedAndDumpsNothing) {
  CDescriptionField aField(nullptr, CTLRX_DS_SCALAR, CTLRX_DS_DOUBLE);
  EXPECT_STREQ(aField.getName(), "Not initialised");
  aField.setDouble(1.0);
  EXPECT_EQ(aField.dumpText(), "");
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { aField.getString(); }, &aMessage), CTLRX_ERR_DS_TYPE);
  EXPECT_EQ(aMessage, "Not initialised");
}

TEST_F(DescriptionTest, ScalarConversionsSetAndReadTheSingleValue) {
  CDescriptionField aInt("I", CTLRX_DS_SCALAR, CTLRX_DS_INTEGER);
  CDescriptionField aDouble("D", CTLRX_DS_SCALAR, CTLRX_DS_DOUBLE);
  CDescriptionField aText("S", CTLRX_DS_SCALAR, CTLRX_DS_STRING);
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
}

// ------------------------------------------------------ getter check order

TEST_F(DescriptionTest, ZeroIndexGettersCheckTypeBeforeSetFlag) {
  CDescriptionField aDouble("D", CTLRX_DS_SCALAR, CTLRX_DS_DOUBLE);
  CDescriptionField aText("S", CTLRX_DS_SCALAR, CTLRX_DS_STRING);
  // Unset and wrong type: the type check comes first.
  EXPECT_EQ(tlrxCodeOf([&] { aDouble.getInteger(); }), CTLRX_ERR_DS_TYPE);
  EXPECT_EQ(tlrxCodeOf([&] { aText.getDouble(); }), CTLRX_ERR_DS_TYPE);
  EXPECT_EQ(tlrxCodeOf([&] { aDouble.getString(); }), CTLRX_ERR_DS_TYPE);
  EXPECT_EQ(tlrxCodeOf([&] { aDouble.getDouble(); }), CTLRX_ERR_DS_NOT_SET);
  EXPECT_EQ(tlrxCodeOf([&] { aText.getString(); }), CTLRX_ERR_DS_NOT_SET);
}

TEST_F(DescriptionTest, GetIntegerByIndexNeverSubstitutes) {
  CDescriptionField aInts("Counts", CTLRX_DS_VECTOR, CTLRX_DS_INTEGER);
  aInts.allocate(1, 3);
  aInts.setInteger(1, 4);
  EXPECT_EQ(aInts.getInteger(0), 0); // unset elements read as stored
  EXPECT_EQ(aInts.getInteger(1), 4);
  EXPECT_EQ(tlrxCodeOf([&] { aInts.getInteger(3); }), CTLRX_ERR_DS_RANGE);
  EXPECT_EQ(tlrxCodeOf([&] { aInts.getInteger(-1); }), CTLRX_ERR_DS_RANGE);
  CDescriptionField aDoubles("Values", CTLRX_DS_VECTOR, CTLRX_DS_DOUBLE);
  aDoubles.allocate(1, 3);
  EXPECT_EQ(tlrxCodeOf([&] { aDoubles.getInteger(9); }), CTLRX_ERR_DS_TYPE); // type before index
  CDescriptionField aScalar("One", CTLRX_DS_SCALAR, CTLRX_DS_INTEGER);
  aScalar.setInteger(8);
  EXPECT_EQ(aScalar.getInteger(0), 8);
  EXPECT_EQ(tlrxCodeOf([&] { aScalar.getInteger(1); }), CTLRX_ERR_DS_TYPE);
  CDescriptionField aEmptyMatrix("M", CTLRX_DS_MATRIX, CTLRX_DS_INTEGER);
  EXPECT_EQ(tlrxCodeOf([&] { aEmptyMatrix.getInteger(0); }), CTLRX_ERR_DS_RANGE);
}

TEST_F(DescriptionTest, GetDoubleBeyondTheEndSubstitutesExceptForPulseDurations) {
  CDescriptionField aPlain("ChirpRate", CTLRX_DS_VECTOR, CTLRX_DS_DOUBLE);
  aPlain.allocate(1, 2);
  aPlain.setDouble(1, 0.25);
  EXPECT_EQ(aPlain.getDouble(1), 0.25);
  EXPECT_EQ(aPlain.getDouble(2), -9999.0);
  EXPECT_EQ(aPlain.getDouble(-1), -9999.0);
  for (const char *aName : {"PulseDuration", "MasterPulseDurationSeconds"}) {
    CDescriptionField aPulse(aName, CTLRX_DS_VECTOR, CTLRX_DS_DOUBLE);
    aPulse.allocate(1, 2);
    EXPECT_EQ(aPulse.getDouble(1), 0.0);
    std::string aMessage;
    EXPECT_EQ(tlrxCodeOf([&] { aPulse.getDouble(2); }, &aMessage), CTLRX_ERR_DS_RANGE) << aName;
    EXPECT_EQ(aMessage, aName);
  }
  CDescriptionField aInts("PulseDuration", CTLRX_DS_VECTOR, CTLRX_DS_INTEGER);
  aInts.allocate(1, 2);
  EXPECT_EQ(tlrxCodeOf([&] { aInts.getDouble(5); }), CTLRX_ERR_DS_TYPE);
  CDescriptionField aScalar("S", CTLRX_DS_SCALAR, CTLRX_DS_DOUBLE);
  EXPECT_EQ(tlrxCodeOf([&] { aScalar.getDouble(1); }), CTLRX_ERR_DS_TYPE);
  CDescriptionField aMatrix("M", CTLRX_DS_MATRIX, CTLRX_DS_DOUBLE);
  aMatrix.allocate(2, 2);
  EXPECT_EQ(tlrxCodeOf([&] { aMatrix.getDouble(1); }), CTLRX_ERR_DS_TYPE);
}

TEST_F(DescriptionTest, MatrixGettersCheckInTheirOwnOrder) {
  CDescriptionField aDoubles("D", CTLRX_DS_MATRIX, CTLRX_DS_DOUBLE);
  aDoubles.allocate(2, 3);
  EXPECT_EQ(aDoubles.getDouble(1, 2), 0.0); // never set, no error
  EXPECT_EQ(tlrxCodeOf([&] { aDoubles.getDouble(2, 0); }), CTLRX_ERR_DS_RANGE);
  EXPECT_EQ(tlrxCodeOf([&] { aDoubles.getDouble(0, 3); }), CTLRX_ERR_DS_RANGE);
  // get integer (row, col): bounds before type; get double: type before bounds.
  EXPECT_EQ(tlrxCodeOf([&] { aDoubles.getInteger(5, 5); }), CTLRX_ERR_DS_RANGE);
  EXPECT_EQ(tlrxCodeOf([&] { aDoubles.getInteger(0, 0); }), CTLRX_ERR_DS_TYPE);
  CDescriptionField aInts("I", CTLRX_DS_MATRIX, CTLRX_DS_INTEGER);
  aInts.allocate(2, 2);
  EXPECT_EQ(tlrxCodeOf([&] { aInts.getDouble(5, 5); }), CTLRX_ERR_DS_TYPE);
  // get string (row, col): set flag first, then type.
  EXPECT_EQ(tlrxCodeOf([&] { aInts.getString(0, 0); }), CTLRX_ERR_DS_NOT_SET);
  aInts.setInteger(0, 0, 3);
  EXPECT_EQ(tlrxCodeOf([&] { aInts.getString(0, 0); }), CTLRX_ERR_DS_TYPE);
  CDescriptionField aTexts("T", CTLRX_DS_MATRIX, CTLRX_DS_STRING);
  aTexts.allocate(1, 2);
  EXPECT_EQ(tlrxCodeOf([&] { aTexts.getString(0, 1); }), CTLRX_ERR_DS_NOT_SET);
  EXPECT_EQ(tlrxCodeOf([&] { aTexts.getString(4, 4); }), CTLRX_ERR_DS_NOT_SET);
  aTexts.setString(0, 1, "v");
  EXPECT_STREQ(aTexts.getString(0, 1), "v");
}

TEST_F(DescriptionTest, StringByIndexChecksTypeThenElementSet) {
  CDescriptionField aTexts("Names", CTLRX_DS_VECTOR, CTLRX_DS_STRING);
  aTexts.allocate(1, 2);
  aTexts.setString(0, "first");
  EXPECT_STREQ(aTexts.getString(0), "first");
  EXPECT_EQ(tlrxCodeOf([&] { aTexts.getString(1); }), CTLRX_ERR_DS_NOT_SET);
  EXPECT_EQ(tlrxCodeOf([&] { aTexts.getString(2); }), CTLRX_ERR_DS_NOT_SET);
  CDescriptionField aInts("Ints", CTLRX_DS_VECTOR, CTLRX_DS_INTEGER);
  aInts.allocate(1, 1);
  EXPECT_EQ(tlrxCodeOf([&] { aInts.getString(7); }), CTLRX_ERR_DS_TYPE);
}

// ------------------------------------------------------- setter check order

TEST_F(DescriptionTest, SettersCheckStorageThenBoundsThenType) {
  CDescriptionField aInts("Ints", CTLRX_DS_VECTOR, CTLRX_DS_INTEGER);
  aInts.allocate(1, 3);
  EXPECT_EQ(tlrxCodeOf([&] { aInts.setDouble(5, 0, 1.0); }), CTLRX_ERR_DS_RANGE);
  EXPECT_EQ(tlrxCodeOf([&] { aInts.setDouble(0, 1, 1.0); }), CTLRX_ERR_DS_TYPE);
  EXPECT_EQ(tlrxCodeOf([&] { aInts.setInteger(3, 1); }), CTLRX_ERR_DS_RANGE);
  EXPECT_EQ(tlrxCodeOf([&] { aInts.setInteger(-1, 1); }), CTLRX_ERR_DS_RANGE);
  aInts.setInteger(2, 9);
  EXPECT_EQ(aInts.getInteger(2), 9);
  // No storage yet: 848646 whatever the type.
  CDescriptionField aEmpty("Empty", CTLRX_DS_VECTOR, CTLRX_DS_INTEGER);
  EXPECT_EQ(tlrxCodeOf([&] { aEmpty.setString(0, "x"); }), CTLRX_ERR_DS_RANGE);
  EXPECT_EQ(tlrxCodeOf([&] { aEmpty.setInteger(0, 1); }), CTLRX_ERR_DS_RANGE);
}

TEST_F(DescriptionTest, StoredStringsAreCopiesOwnedByTheField) {
  CDescriptionField aText("T", CTLRX_DS_SCALAR, CTLRX_DS_STRING);
  char aBuffer[8];
  std::snprintf(aBuffer, sizeof(aBuffer), "one");
  aText.setString(aBuffer);
  std::snprintf(aBuffer, sizeof(aBuffer), "two");
  EXPECT_STREQ(aText.getString(), "one");
  aText.setString("three");
  EXPECT_STREQ(aText.getString(), "three");
}

TEST_F(DescriptionTest, UnsetClearsTheFlagAndChecksBounds) {
  CDescriptionField aTexts("Names", CTLRX_DS_VECTOR, CTLRX_DS_STRING);
  aTexts.allocate(1, 2);
  aTexts.setString(1, "x");
  aTexts.unset(1);
  EXPECT_FALSE(aTexts.isSet(1));
  EXPECT_EQ(tlrxCodeOf([&] { aTexts.getString(1); }), CTLRX_ERR_DS_NOT_SET);
  EXPECT_EQ(tlrxCodeOf([&] { aTexts.unset(2); }), CTLRX_ERR_DS_RANGE);
  CDescriptionField aScalar("S", CTLRX_DS_SCALAR, CTLRX_DS_DOUBLE);
  aScalar.setDouble(1.0);
  aScalar.unset();
  EXPECT_FALSE(aScalar.holdsValue());
}

TEST_F(DescriptionTest, IsSetFormsAnswerOrRaiseByShape) {
  CDescriptionField aVector("V", CTLRX_DS_VECTOR, CTLRX_DS_DOUBLE);
  aVector.allocate(1, 2);
  aVector.setDouble(0, 1.0);
  EXPECT_TRUE(aVector.isSet(0));
  EXPECT_FALSE(aVector.isSet(1));
  EXPECT_FALSE(aVector.isSet(2)); // beyond the end: false, no error
  EXPECT_EQ(tlrxCodeOf([&] { aVector.isSet(); }), CTLRX_ERR_DS_TYPE);
  EXPECT_FALSE(aVector.isSet(0, 5));
  EXPECT_FALSE(aVector.isSet(-1, 0));
  CDescriptionField aScalar("S", CTLRX_DS_SCALAR, CTLRX_DS_DOUBLE);
  EXPECT_EQ(tlrxCodeOf([&] { aScalar.isSet(1); }), CTLRX_ERR_DS_TYPE);
  CDescriptionField aMatrix("M", CTLRX_DS_MATRIX, CTLRX_DS_DOUBLE);
  EXPECT_FALSE(aMatrix.isSet(0, 0)); // no storage
  aMatrix.allocate(2, 2);
  EXPECT_EQ(tlrxCodeOf([&] { aMatrix.isSet(1); }), CTLRX_ERR_DS_TYPE);
  aScalar.release();
  EXPECT_EQ(tlrxCodeOf([&] { aScalar.isSet(); }), CTLRX_ERR_DS_CHECK);
}

// ----------------------------------------------------- storage and holding

TEST_F(DescriptionTest, VectorsHoldAValueOnceAllocatedAndLoseItOnClear) {
  CDescriptionField aVector("V", CTLRX_DS_VECTOR, CTLRX_DS_DOUBLE);
  EXPECT_FALSE(aVector.holdsValue());
  aVector.allocate(1, 0);
  EXPECT_FALSE(aVector.holdsValue());
  aVector.allocate(1, 4);
  EXPECT_TRUE(aVector.holdsValue()); // storage alone makes a vector present
  EXPECT_EQ(aVector.getNumberOfElements(), 4);
  aVector.clear();
  EXPECT_EQ(aVector.getRowNbr(), 0);
  EXPECT_EQ(aVector.getColNbr(), 0);
  EXPECT_FALSE(aVector.holdsValue());
  EXPECT_EQ(tlrxCodeOf([&] { aVector.setDouble(0, 1.0); }), CTLRX_ERR_DS_RANGE);
}

TEST_F(DescriptionTest, ClearingAScalarKeepsItsStorage) {
  CDescriptionField aScalar("S", CTLRX_DS_SCALAR, CTLRX_DS_STRING);
  aScalar.setString("a");
  aScalar.clear();
  EXPECT_FALSE(aScalar.holdsValue());
  EXPECT_EQ(aScalar.getRowNbr(), 1);
  aScalar.setString("b");
  EXPECT_STREQ(aScalar.getString(), "b");
}

TEST_F(DescriptionTest, AllocationRefusesStructsAndUnusableCounts) {
  CDescriptionField aStruct("Orbit", CTLRX_DS_MULTIPLE, CTLRX_DS_FIELD_POINTER);
  EXPECT_EQ(tlrxCodeOf([&] { aStruct.allocate(1, 3); }), CTLRX_ERR_DS_TYPE);
  CDescriptionField aVector("V", CTLRX_DS_VECTOR, CTLRX_DS_INTEGER);
  EXPECT_EQ(tlrxCodeOf([&] { aVector.allocate(-1, 3); }), CTLRX_ERR_DS_RANGE);
  EXPECT_EQ(tlrxCodeOf([&] { aVector.allocate(1, -3); }), CTLRX_ERR_DS_RANGE);
  // The product overflows 32 bits: refused before anything is allocated.
  EXPECT_EQ(tlrxCodeOf([&] { aVector.allocate(INT32_MAX, INT32_MAX); }), CTLRX_ERR_DS_RANGE);
  CDescriptionField aUnknown("U", CTLRX_DS_VECTOR, CTLRX_DS_UNRECOGNISED);
  EXPECT_EQ(tlrxCodeOf([&] { aUnknown.allocate(1, 1); }), CTLRX_ERR_DS_TYPE);
}

// ----------------------------------------------------------------- structs

class StructTest : public DescriptionTest {
protected:
  std::unique_ptr<CDescriptionSection> mSection;
  CDescriptionField *mStruct = nullptr;
  void SetUp() override {
    DescriptionTest::SetUp();
    mSection = declare("[Sec]\nOrbit = 3VD x y z\n");
    mStruct = mSection->getField(0);
  }
};

TEST_F(StructTest, HoldsAValueOnlyWhenEveryMemberDoes) {
  EXPECT_FALSE(mStruct->holdsValue());
  EXPECT_EQ(mStruct->getNumberOfElements(), 0);
  mSection->getField(1)->allocate(1, 2);
  mSection->getField(2)->allocate(1, 2);
  EXPECT_FALSE(mStruct->holdsValue());
  mStruct->setNumberOfElements(10);
  EXPECT_TRUE(mStruct->holdsValue());
  for (int32_t i = 0; i < 3; ++i) {
    EXPECT_EQ(mStruct->getMember(i)->getColNbr(), 10);
    EXPECT_EQ(mStruct->getMember(i), mSection->getField(i + 1));
  }
  EXPECT_EQ(mStruct->getNumberOfElements(), 10);
  EXPECT_EQ(mStruct->dumpText(), "[Orbit]  [MULTIPLE]  [Field Of Section pointer]  [Number of sub fiels : 3]\n");
  // An element of the struct is set when every member's element is.
  mSection->getField(1)->setDouble(4, 1.0);
  mSection->getField(2)->setDouble(4, 2.0);
  EXPECT_FALSE(mStruct->isSet(4));
  mSection->getField(3)->setDouble(4, 3.0);
  EXPECT_TRUE(mStruct->isSet(4));
  EXPECT_FALSE(mStruct->isSet(10));
}

TEST_F(StructTest, StructOfScalarsNeedsEveryMemberSetAndRefusesElementCounts) {
  auto aSection = declare("[Sec]\nCorner = 2D lat lon\n");
  CDescriptionField *aCorner = aSection->getField(0);
  aSection->getField(1)->setDouble(1.0);
  EXPECT_FALSE(aCorner->holdsValue());
  aSection->getField(2)->setDouble(2.0);
  EXPECT_TRUE(aCorner->holdsValue());
  EXPECT_EQ(tlrxCodeOf([&] { aCorner->setNumberOfElements(3); }), CTLRX_ERR_DS_TYPE);
}

TEST_F(StructTest, AssignmentOfAStructComparesMemberCountsOnly) {
  auto aOther = declare("[Sec]\nOrbit = 3VD x y z\n");
  aOther->getField(0)->setNumberOfElements(2);
  EXPECT_TRUE(mStruct->assignFrom(*aOther->getField(0)));
  EXPECT_EQ(mSection->getField(1)->getColNbr(), 0); // members are copied as fields
  auto aSmaller = declare("[Sec]\nOrbit = 2VD x y\n");
  aSmaller->getField(0)->setNumberOfElements(2);
  EXPECT_EQ(tlrxCodeOf([&] { mStruct->assignFrom(*aSmaller->getField(0)); }), CTLRX_ERR_DS_TYPE);
}

// -------------------------------------------------------------- assignment

TEST_F(DescriptionTest, AssignmentCopiesSetCellsOnly) {
  CDescriptionField aSource("V", CTLRX_DS_VECTOR, CTLRX_DS_STRING);
  aSource.allocate(1, 3);
  aSource.setString(0, "a");
  aSource.setString(2, "c");
  CDescriptionField aTarget("V", CTLRX_DS_VECTOR, CTLRX_DS_STRING);
  EXPECT_TRUE(aTarget.assignFrom(aSource));
  EXPECT_EQ(aTarget.getColNbr(), 3);
  EXPECT_STREQ(aTarget.getString(0), "a");
  EXPECT_FALSE(aTarget.isSet(1));
  EXPECT_STREQ(aTarget.getString(2), "c");
  aSource.setString(0, "changed");
  EXPECT_STREQ(aTarget.getString(0), "a");
}

TEST_F(DescriptionTest, AssignmentFromAnEmptyFieldLeavesTheTargetAlone) {
  CDescriptionField aSource("S", CTLRX_DS_SCALAR, CTLRX_DS_STRING); // other type, but empty
  CDescriptionField aTarget("T", CTLRX_DS_SCALAR, CTLRX_DS_DOUBLE);
  aTarget.setDouble(3.0);
  EXPECT_TRUE(aTarget.assignFrom(aSource));
  EXPECT_EQ(aTarget.getDouble(), 3.0);
  aSource.setString("x");
  EXPECT_EQ(tlrxCodeOf([&] { aTarget.assignFrom(aSource); }), CTLRX_ERR_DS_TYPE);
  EXPECT_EQ(aTarget.getDouble(), 3.0);
}

// ------------------------------------------------------------------- dumps

TEST_F(DescriptionTest, DumpShowsShapeCountsAndFirstValue) {
  CDescriptionField aVector("V", CTLRX_DS_VECTOR, CTLRX_DS_DOUBLE);
  aVector.allocate(1, 3);
  aVector.setDouble(0, 3.14159265);
  EXPECT_EQ(aVector.dumpText(), "[V]  [VECTOR]  [Double]  [Number of elements : 3]  =  3.14159\n");
  CDescriptionField aMatrix("M", CTLRX_DS_MATRIX, CTLRX_DS_STRING);
  aMatrix.allocate(2, 2);
  aMatrix.setString(0, 0, "a");
  EXPECT_EQ(aMatrix.dumpText(), "[M]  [MARTIX]  [String]  [Row Nbr : 2]  [Col Nbr : 2]  =  [a]\n");
  CDescriptionField aInt("I", CTLRX_DS_SCALAR, CTLRX_DS_INTEGER);
  aInt.setInteger(-12);
  EXPECT_EQ(aInt.dumpText(), "[I]  [SCALAR]  [Integer]  =  -12\n");
  CDescriptionField aOdd("W", 7, 9);
  EXPECT_EQ(aOdd.dumpText(), "[W]  [WRONG]  [WRONG] : EMPTY\n");
  EXPECT_STREQ(fdfShapeName(-1), "WRONG");
  EXPECT_STREQ(fdfValueTypeName(3), "Field Of Section pointer");
}

// --------------------------------------------------------------- key files

TEST_F(DescriptionTest, KeyFileStructWithCommentDeclaresMembersAfterTheStruct) {
  auto aSection = declare("; header comment\n[Sec]\nFirst = I\nOrbit = 3VD x y z ; positions\nLast = MS\n");
  ASSERT_EQ(aSection->getFieldCount(), 6);
  EXPECT_STREQ(aSection->getName(), "Sec");
  const CDescriptionField *aOrbit = aSection->getField(1);
  EXPECT_STREQ(aOrbit->getName(), "Orbit");
  EXPECT_EQ(aOrbit->getShape(), CTLRX_DS_MULTIPLE);
  EXPECT_EQ(aOrbit->getValueType(), CTLRX_DS_FIELD_POINTER);
  EXPECT_EQ(aOrbit->getParentIndex(), -1);
  EXPECT_EQ(aOrbit->getMemberCount(), 3);
  const char *aNames[] = {"x", "y", "z"};
  for (int32_t i = 0; i < 3; ++i) {
    const CDescriptionField *aMember = aSection->getField(2 + i);
    EXPECT_STREQ(aMember->getName(), aNames[i]);
    EXPECT_EQ(aMember->getShape(), CTLRX_DS_VECTOR);
    EXPECT_EQ(aMember->getValueType(), CTLRX_DS_DOUBLE);
    EXPECT_EQ(aMember->getParentIndex(), 1);
    EXPECT_EQ(aOrbit->getMember(i), aMember);
  }
  EXPECT_EQ(aSection->getField(5)->getShape(), CTLRX_DS_MATRIX);
  EXPECT_EQ(aSection->getField(5)->getValueType(), CTLRX_DS_STRING);
  EXPECT_EQ(aSection->getField(6), nullptr);
}

TEST_F(DescriptionTest, KeyFileTypeCodesGiveShapesAndValueTypes) {
  auto aSection = declare("[Sec]\na=I\nb = D\nc\t=\tF\nd = S\ne = VI\nf = VD(3)\ng = MI\nh = MF\n");
  const int32_t aExpected[][2] = {{0, 0}, {0, 1}, {0, 1}, {0, 2}, {1, 0}, {1, 1}, {2, 0}, {2, 1}};
  ASSERT_EQ(aSection->getFieldCount(), 8);
  for (int32_t i = 0; i < 8; ++i) {
    EXPECT_EQ(aSection->getField(i)->getShape(), aExpected[i][0]) << i;
    EXPECT_EQ(aSection->getField(i)->getValueType(), aExpected[i][1]) << i;
  }
}

TEST_F(DescriptionTest, KeyFileRejectsBadTypeCodesAndMissingMemberNames) {
  for (const char *aLine : {"x = VX", "x = vd", "x = DV", "x = V", "x = ", "x = -3VD a b c", "x = VDD"}) {
    tlrxWriteFile(keyPath(), std::string("[Sec]\nok = I\n") + aLine + "\n");
    CDescriptionSection aSection;
    std::string aMessage;
    EXPECT_EQ(tlrxCodeOf([&] { aSection.declareFromKeyFile(keyPath().c_str(), "Sec"); }, &aMessage), CTLRX_ERR_DS_TYPE)
        << aLine;
    EXPECT_EQ(aMessage, "Sec");
  }
  tlrxWriteFile(keyPath(), "[Sec]\nOrbit = 3VD x y ; z forgotten\n");
  CDescriptionSection aSection;
  EXPECT_EQ(tlrxCodeOf([&] { aSection.declareFromKeyFile(keyPath().c_str(), "Sec"); }), CTLRX_ERR_DS_DECLARATION);
}

TEST_F(DescriptionTest, SectionHeaderMustOpenInTheFirstTwoCharacters) {
  for (const char *aHeader : {"[Sec]", " [Sec]", "[ Sec ]", "\t[Sec]"}) {
    auto aSection = declare(std::string("[Other]\nq = I\n") + aHeader + "\nv = D\n");
    ASSERT_EQ(aSection->getFieldCount(), 1) << aHeader;
    EXPECT_STREQ(aSection->getField(0)->getName(), "v");
  }
  tlrxWriteFile(keyPath(), "  [Sec]\nv = D\n");
  CDescriptionSection aSection;
  EXPECT_FALSE(aSection.declareFromKeyFile(keyPath().c_str(), "Sec"));
  EXPECT_EQ(aSection.getFieldCount(), 0);
  EXPECT_EQ(fdfScratchBuffersInUse(), 0);
}

TEST_F(DescriptionTest, KeyFileSectionRunsToTheEndOfTheFile) {
  // A later header is read as a line without "=" and skipped.
  auto aSection = declare("[Sec]\na = I\n[Next]\nb = D\n");
  ASSERT_EQ(aSection->getFieldCount(), 2);
  EXPECT_STREQ(aSection->getField(1)->getName(), "b");
  // Without a name the first header names the section.
  tlrxWriteFile(keyPath(), "[First]\nc = S\n");
  CDescriptionSection aAny;
  EXPECT_TRUE(aAny.declareFromKeyFile(keyPath().c_str(), nullptr));
  EXPECT_STREQ(aAny.getName(), "First");
}

TEST_F(DescriptionTest, OverLongKeyFileLineIsCutNotSplit) {
  // The tail of a line longer than the line buffer must not come back as a
  // line of its own: here it would declare a field.
  std::string aText = "[Sec]\nA = I ;" + std::string(1500000, 'x') + " Ghost = I\nB = D\n";
  auto aSection = declare(aText);
  ASSERT_EQ(aSection->getFieldCount(), 2);
  EXPECT_STREQ(aSection->getField(0)->getName(), "A");
  EXPECT_STREQ(aSection->getField(1)->getName(), "B");
}

TEST_F(DescriptionTest, NulByteInsideALineDoesNotSwallowTheNextLine) {
  std::string aText = "[Sec]\na = I";
  aText += '\0';
  aText += " junk\nb = D\n";
  auto aSection = declare(aText);
  ASSERT_EQ(aSection->getFieldCount(), 2);
  EXPECT_STREQ(aSection->getField(1)->getName(), "b");
}

TEST_F(DescriptionTest, KeyFileDeclarationFailuresNameTheirCause) {
  CDescriptionSection aSection;
  EXPECT_EQ(tlrxCodeOf([&] { aSection.declareFromKeyFile(nullptr, nullptr); }), CTLRX_ERR_DS_DECLARATION);
  std::string aMessage;
  const std::string aMissing = mDir.file("missing.key");
  EXPECT_EQ(tlrxCodeOf([&] { aSection.declareFromKeyFile(aMissing.c_str(), "Sec"); }, &aMessage), CTLRX_ERR_FILE_OPEN);
  EXPECT_EQ(aMessage, aMissing);
  EXPECT_EQ(tlrxCodeOf([&] { aSection.declareFromKeyFile(nullptr, "NoSuchSection"); }, &aMessage), CTLRX_ERR_FILE_OPEN);
  std::string aDir;
  ASSERT_TRUE(fdfGetEnvVar(aDir, "TELLURIX_KEY_FILES_DIR"));
  EXPECT_EQ(aMessage, aDir + "NoSuchSection.key");
  // A "_hdr" key file name falls back to its ".sml" form.
  tlrxWriteFile(mDir.file("keys.sml"), "[Sec]\nv = D\n");
  EXPECT_TRUE(aSection.declareFromKeyFile(mDir.file("keys_hdr").c_str(), "Sec"));
  EXPECT_EQ(aSection.getFieldCount(), 1);
  EXPECT_EQ(fdfScratchBuffersInUse(), 0);
}

TEST_F(DescriptionTest, TheFieldLimitIsReachedByThe5050thField) {
  auto aFields = [](int theCount) {
    std::string aText = "[Sec]\n";
    for (int i = 0; i < theCount; ++i) {
      aText += "f" + std::to_string(i) + " = D\n";
    }
    return aText;
  };
  auto aSection = declare(aFields(CTLRX_DS_MAX_NBR_FIELDS - 1));
  EXPECT_EQ(aSection->getFieldCount(), 5049);
  tlrxWriteFile(keyPath(), aFields(CTLRX_DS_MAX_NBR_FIELDS)); // the 5050th is the last line
  CDescriptionSection aFull;
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { aFull.declareFromKeyFile(keyPath().c_str(), "Sec"); }, &aMessage), CTLRX_ERR_DS_DECLARATION);
  EXPECT_EQ(aMessage, "Sec");
  // Struct members count too; a huge declared count is refused before any
  // member array is sized by it.
  tlrxWriteFile(keyPath(), aFields(5046) + "S = 3VD a b c\n");
  EXPECT_EQ(tlrxCodeOf([&] { aFull.declareFromKeyFile(keyPath().c_str(), "Sec"); }), CTLRX_ERR_DS_DECLARATION);
  tlrxWriteFile(keyPath(), "[Sec]\nS = 99999999999999999999VD a\n");
  EXPECT_EQ(tlrxCodeOf([&] { aFull.declareFromKeyFile(keyPath().c_str(), "Sec"); }), CTLRX_ERR_DS_DECLARATION);
  EXPECT_EQ(fdfScratchBuffersInUse(), 0);
}

TEST_F(DescriptionTest, RedeclaringASectionReleasesItsOldFields) {
  auto aSection = declare("[Sec]\na = I\nb = I\n");
  tlrxWriteFile(keyPath(), "[Sec]\nc = S\n");
  EXPECT_TRUE(aSection->declareFromKeyFile(keyPath().c_str(), "Sec"));
  ASSERT_EQ(aSection->getFieldCount(), 1);
  EXPECT_STREQ(aSection->getField(0)->getName(), "c");
}

// ----------------------------------------------------------- scratch pool

TEST_F(DescriptionTest, ScratchPoolHas110SlotsAndReportsExhaustion) {
  std::vector<std::unique_ptr<CScratchBuffer>> aLeases;
  for (int i = 0; i < CTLRX_DS_POOL_SLOTS; ++i) {
    aLeases.push_back(std::make_unique<CScratchBuffer>(16));
  }
  EXPECT_EQ(fdfScratchBuffersInUse(), 110);
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([] { CScratchBuffer aOne(16); }, &aMessage), CTLRX_ERR_DS_RANGE);
  EXPECT_EQ(aMessage, "All pools are busy");
  tlrxWriteFile(keyPath(), "[Sec]\na = I\n");
  CDescriptionSection aSection;
  EXPECT_EQ(tlrxCodeOf([&] { aSection.declareFromKeyFile(keyPath().c_str(), "Sec"); }), CTLRX_ERR_DS_RANGE);
  aLeases.pop_back();
  EXPECT_TRUE(aSection.declareFromKeyFile(keyPath().c_str(), "Sec"));
  aLeases.clear();
  EXPECT_EQ(fdfScratchBuffersInUse(), 0);
  CScratchBuffer aBig(2000000);
  EXPECT_GE(aBig.capacity(), 2000000u);
}

// ------------------------------------------------------------ descriptions

TEST_F(DescriptionTest, DottedKeysSplitAtTheFirstDot) {
  CDescription aDescription;
  auto aSection = std::make_unique<CDescriptionSection>();
  aSection->setName("A");
  aSection->appendField(std::make_unique<CDescriptionField>("b.c", CTLRX_DS_SCALAR, CTLRX_DS_INTEGER));
  aSection->appendField(std::make_unique<CDescriptionField>("x", CTLRX_DS_SCALAR, CTLRX_DS_INTEGER));
  aDescription.addSection(std::move(aSection));
  auto aOther = std::make_unique<CDescriptionSection>();
  aOther->setName("B");
  aOther->appendField(std::make_unique<CDescriptionField>("x", CTLRX_DS_SCALAR, CTLRX_DS_DOUBLE));
  aOther->appendField(std::make_unique<CDescriptionField>("y", CTLRX_DS_SCALAR, CTLRX_DS_DOUBLE));
  aDescription.addSection(std::move(aOther));

  EXPECT_EQ(aDescription.findField("A.b.c"), aDescription.getSection(0)->getField(0));
  EXPECT_EQ(aDescription.findField("x"), aDescription.getSection(0)->getField(1)); // first section wins
  EXPECT_EQ(aDescription.findField("B.x"), aDescription.getSection(1)->getField(0));
  EXPECT_EQ(aDescription.findField("y"), aDescription.getSection(1)->getField(1));
  EXPECT_EQ(aDescription.findField("A.y"), nullptr); // only the named section
  EXPECT_EQ(aDescription.findField("C.x"), nullptr);
  EXPECT_EQ(aDescription.findField(".x"), nullptr);
  EXPECT_EQ(aDescription.findField("b.c"), nullptr);
  EXPECT_EQ(aDescription.findSection("B"), aDescription.getSection(1));
  EXPECT_EQ(aDescription.findSection("b"), nullptr);
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { aDescription.getField("A.missing"); }, &aMessage), CTLRX_ERR_DS_FIELD_MISSING);
  EXPECT_EQ(aMessage, "A.missing");
  // A declared field without a value is missing for the value accessor only.
  EXPECT_NO_THROW(aDescription.getField("B.y"));
  EXPECT_EQ(tlrxCodeOf([&] { aDescription.getFieldWithValue("B.y"); }, &aMessage), CTLRX_ERR_DS_FIELD_MISSING);
  EXPECT_EQ(aMessage, "B.y");
  aDescription.getField("B.y").setDouble(1.0);
  EXPECT_EQ(aDescription.getFieldWithValue("B.y").getDouble(), 1.0);
}

TEST_F(DescriptionTest, CopyBetweenRasterInfoSectionsKeepsTheTargetScaleFactors) {
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
}

TEST_F(DescriptionTest, CopyOfSectionsOfAnotherNameOrLayoutFails) {
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

  CDescription aTarget({"RasterInfo"});
  CDescription aSource;
  auto aSection = std::make_unique<CDescriptionSection>();
  aSection->setName("RasterInfo");
  aSource.addSection(std::move(aSection));
  EXPECT_FALSE(aTarget.copyFrom(aSource, true));
  EXPECT_EQ(tlrxCodeOf([&] { aTarget = aSource; }), CTLRX_ERR_DS_DECLARATION);
  // Same layout, another value type at one position: the assignment raises.
  auto aTyped = declare("[RasterInfo]\nNrOfLinesPerImage = D\n", "RasterInfo");
  aTyped->getField(0)->setDouble(1.0);
  EXPECT_EQ(tlrxCodeOf([&] { aSameLayout->copyValuesFrom(*aTyped); }), CTLRX_ERR_DS_TYPE);
}

TEST_F(DescriptionTest, PrintListsSectionsAndFields) {
  auto aSection = declare("[Sec]\na = I\nb = S\n");
  aSection->getField(0)->setInteger(4);
  CDescription aDescription;
  aDescription.addSection(std::move(aSection));
  EXPECT_EQ(aDescription.printText(true), "\n\n << Total number of Sections : 1 >>"
                                          "\n\n << [Sec]  -  Total number of Fields : 2 >>\n\n"
                                          "[a]  [SCALAR]  [Integer]  =  4\n"
                                          "[b]  [SCALAR]  [String] : EMPTY\n"
                                          "\n\n");
  EXPECT_EQ(aDescription.getSection(0)->printText(false),
            "\n\n << [Sec]  -  Total number of Fields : 2 >>\n\n[a]  [SCALAR]  [Integer]  =  4\n");
}

// --------------------------------------------------------- mandatory files

TEST_F(DescriptionTest, MandatoryCheckLogsEveryEmptyListedField) {
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
  EXPECT_EQ(aLog.find("[PixelSpacingRg]"), std::string::npos); // stops at the first failing section
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { aHeader.checkMandatory(aMandatory.c_str(), true); }, &aMessage), CTLRX_ERR_DS_CHECK);
  EXPECT_EQ(aMessage, aMandatory);

  aHeader.getField("RasterInfo.NrOfPixelsPerLine").setInteger(10);
  aHeader.getField("RasterInfo.CellType").setString("FLOAT");
  EXPECT_FALSE(aHeader.checkMandatory(aMandatory.c_str(), false)); // Processing now
  aHeader.getField("Processing.PixelSpacingRg").setDouble(1.0);
  EXPECT_TRUE(aHeader.checkMandatory(aMandatory.c_str(), true));
}

TEST_F(DescriptionTest, MandatoryFileByNameComesFromTheMandatoryDirectory) {
  CDescription aHeader;
  fdfDeclareStandardHeader(aHeader);
  EXPECT_FALSE(aHeader.checkMandatory("StandardHeader", false));
  aHeader.getField("RasterInfo.NrOfLinesPerImage").setInteger(1);
  aHeader.getField("RasterInfo.NrOfPixelsPerLine").setInteger(1);
  aHeader.getField("RasterInfo.CellType").setString("FLOAT");
  EXPECT_TRUE(aHeader.checkMandatory("StandardHeader", false));
  EXPECT_FALSE(aHeader.checkMandatory("GeocodedHeader", false));
  // Nothing can be verified without the file.
  EXPECT_FALSE(aHeader.checkMandatory("NoSuchList", false));
  EXPECT_EQ(tlrxCodeOf([&] { aHeader.checkMandatory("NoSuchList", true); }), CTLRX_ERR_DS_CHECK);
  EXPECT_EQ(fdfScratchBuffersInUse(), 0);
}
