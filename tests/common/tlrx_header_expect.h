// Result headers as the tests check them: one line lists the fields a header
// must hold; and the rows of its "OtherInfo" table.
#pragma once

#include "tlrx_description_section.h"
#include "tlrx_standard_header.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstdlib>
#include <string>
#include <vector>

// theText cut at every theSeparator.
inline std::vector<std::string> tlrxSplit(const std::string &theText, char theSeparator) {
  std::vector<std::string> aParts(1);
  for (char aChar : theText)
    if (aChar == theSeparator)
      aParts.emplace_back();
    else
      aParts.back() += aChar;
  return aParts;
}

// The header of thePath holds theFields, "Key=value;Key=value": a key without
// a section is in the section of the key before it (RasterInfo at first);
// numbers compare as numbers, vector elements are joined by ",", and an
// empty value means the field holds none.
inline void tlrxExpectHeader(const std::string &thePath, const std::string &theFields) {
  CDescription aHeader;
  fdfReadStandardHeader(thePath.c_str(), aHeader);
  std::string aSection = "RasterInfo";
  for (const std::string &aPair : tlrxSplit(theFields, ';')) {
    std::string aKey = aPair.substr(0, aPair.find('='));
    const std::string aValue = aPair.substr(aKey.size() + 1);
    if (aKey.find('.') == std::string::npos)
      aKey = aSection + "." + aKey;
    aSection = aKey.substr(0, aKey.find('.'));
    SCOPED_TRACE(thePath + " " + aKey);
    const CDescriptionField *aField = aHeader.findField(aKey.c_str());
    const bool aVector = aField != nullptr && aField->getShape() == CTLRX_DS_VECTOR;
    const std::vector<std::string> aWant = aVector ? tlrxSplit(aValue, ',') : std::vector<std::string>{aValue};
    if (aField == nullptr || aField->holdsValue() == aValue.empty() ||
        (aVector && !aValue.empty() && aField->getNumberOfElements() != static_cast<int32_t>(aWant.size()))) {
      ADD_FAILURE() << (aField == nullptr ? "no such field" : "holds another count of values");
      continue;
    }
    for (int32_t i = 0; !aValue.empty() && i < static_cast<int32_t>(aWant.size()); ++i) {
      if (aField->getValueType() == CTLRX_DS_STRING) {
        EXPECT_EQ(std::string(aVector ? aField->getString(i) : aField->getString()), aWant[i]);
      } else if (aField->getValueType() == CTLRX_DS_INTEGER) {
        EXPECT_EQ(aVector ? aField->getInteger(i) : aField->getInteger(), std::atol(aWant[i].c_str()));
      } else {
        const double aGot = aVector ? aField->getDouble(i) : aField->getDouble();
        const double aExpected = std::strtod(aWant[i].c_str(), nullptr);
        EXPECT_TRUE(aGot == aExpected || (std::isnan(aGot) && std::isnan(aExpected))) << aGot << " vs " << aWant[i];
      }
    }
  }
}

// The value of the first "RasterInfo.OtherInfo" row of thePath's header whose
// key begins with theKey, "" when none does.
inline std::string tlrxOtherInfo(const std::string &thePath, const std::string &theKey) {
  CDescription aHeader;
  fdfReadStandardHeader(thePath.c_str(), aHeader);
  const CDescriptionField &aTable = aHeader.getField("RasterInfo.OtherInfo");
  for (int32_t aRow = 0; aTable.holdsValue() && aRow < aTable.getRowNbr(); ++aRow)
    if (aTable.isSet(aRow, 0) && std::string(aTable.getString(aRow, 0)).compare(0, theKey.size(), theKey) == 0)
      return aTable.getString(aRow, 1);
  return "";
}
