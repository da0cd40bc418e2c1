// Typed reads of header numbers: one table of field, stored text, accessor,
// and the value or the error (code and message naming the field).
#include "tlrx_description_test_support.h"
#include "tlrx_header_numbers.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>

namespace {

enum class EAccessor { kInteger, kIntegerOr, kSize, kReal, kRealOr, kFinite, kNull };

struct SCase {
  const char *mKey;
  const char *mText; // stored as the field's type reads it; nullptr leaves it unset
  EAccessor mAccessor;
  double mValue;
  const char *mError; // message of 848642, nullptr when the value is read
};

const double sNaN = std::nan("");
const double sInf = std::numeric_limits<double>::infinity();

const char *const CTLRX_KEYS = "[RasterInfo]\nLines = I\nNullCellValue = D\nText = S\nVec = VD\n";

double read(const CDescription &theHeader, const SCase &theCase, const SHeaderReader &theReader = {}) {
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

class HeaderNumberAccessors : public ::testing::Test {
protected:
  CTempDir mDir;
  CDescription mHeader;
  void SetUp() override {
    tlrxStartLibraryEnvironment(mDir.path());
    tlrxDeclare(mHeader, mDir.path(), CTLRX_KEYS, {"RasterInfo"});
  }
  void store(const SCase &theCase) {
    mHeader.clearValues();
    CDescriptionField *aField = mHeader.findField(theCase.mKey);
    if (aField == nullptr || theCase.mText == nullptr)
      return;
    if (aField->getShape() != CTLRX_DS_SCALAR)
      aField->setNumberOfElements(1);
    if (aField->getValueType() == CTLRX_DS_STRING)
      aField->setString(theCase.mText);
    else
      fdfSetNumberFromText(*aField, 0, 0, theCase.mText);
  }
};

} // namespace

TEST_F(HeaderNumberAccessors, ReadWholeNumbersAndNameTheFieldOfAnyOther) {
  const SCase aCases[] = {
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
      {"RasterInfo.Text", "inf", EAccessor::kReal, sInf, nullptr},
      {"RasterInfo.Text", "inf", EAccessor::kFinite, 0, "RasterInfo.Text is not a finite number [inf]"},
      {"RasterInfo.NullCellValue", "NaN", EAccessor::kFinite, 0, "RasterInfo.NullCellValue is not a finite number [nan]"},
      {"RasterInfo.NullCellValue", "-2.5", EAccessor::kFinite, -2.5, nullptr},
      {"RasterInfo.NullCellValue", nullptr, EAccessor::kRealOr, -1, nullptr},
      {"RasterInfo.NullCellValue", nullptr, EAccessor::kNull, 0, nullptr},
      {"RasterInfo.NullCellValue", "NaN", EAccessor::kNull, sNaN, nullptr},
      {"RasterInfo.NullCellValue", "-9999", EAccessor::kNull, -9999, nullptr},
  };
  for (const SCase &aCase : aCases) {
    SCOPED_TRACE(std::string(aCase.mKey) + " [" + (aCase.mText != nullptr ? aCase.mText : "unset") + "] accessor " +
                 std::to_string(static_cast<int>(aCase.mAccessor)));
    store(aCase);
    double aValue = 0.0;
    std::string aMessage;
    const int32_t aCode = tlrxCodeOf([&] { aValue = read(mHeader, aCase); }, &aMessage);
    if (aCase.mError == nullptr) {
      EXPECT_EQ(aCode, 0) << aMessage;
      EXPECT_TRUE(tlrxSameDouble(aValue, aCase.mValue)) << aValue;
    } else {
      EXPECT_EQ(aCode, CTLRX_ERR_DS_FIELD_MISSING);
      EXPECT_EQ(aMessage, aCase.mError);
    }
  }
}

TEST_F(HeaderNumberAccessors, AReaderRaisesItsOwnCodeWithItsFileFirst) {
  const SCase aCase = {"RasterInfo.Text", "12 pixels", EAccessor::kSize, 0, nullptr};
  store(aCase);
  std::string aMessage;
  EXPECT_EQ(tlrxCodeOf([&] { read(mHeader, aCase, {261121, "out.hdr"}); }, &aMessage), 261121);
  EXPECT_EQ(aMessage, "out.hdr: RasterInfo.Text is not an integer [12 pixels]");
}
