// Helpers of the description file tests: descriptions declared from key
// text, value comparison, error codes of a call.
#pragma once

#include "tlrx_description_section.h"
#include "tlrx_errors.h"
#include "tlrx_test_support.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

// Declares the named sections of theKeyText (key-file syntax) into
// theDescription, through a key file written into theDir.
inline void tlrxDeclare(CDescription &theDescription, const std::string &theDir, const std::string &theKeyText,
                        const std::vector<std::string> &theNames) {
  static int sFileNbr = 0;
  const std::string aPath = theDir + "decl_" + std::to_string(++sFileNbr) + ".key";
  tlrxWriteFile(aPath, theKeyText);
  for (const std::string &aName : theNames) {
    auto aSection = std::make_unique<CDescriptionSection>();
    aSection->declareFromKeyFile(aPath.c_str(), aName.c_str());
    theDescription.addSection(std::move(aSection));
  }
}

// Code of the CErrorExceptionManager thrown by theCall, 0 when none.
template <typename F> int32_t tlrxCodeOf(F theCall, std::string *theMessage = nullptr) {
  try {
    theCall();
  } catch (const CErrorExceptionManager &aError) {
    if (theMessage != nullptr)
      *theMessage = aError.mMessage;
    return aError.mCode;
  }
  return 0;
}

inline bool tlrxSameDouble(double theA, double theB) {
  if (std::isnan(theA) || std::isnan(theB))
    return std::isnan(theA) && std::isnan(theB);
  return theA == theB && std::signbit(theA) == std::signbit(theB);
}

// Every field of theExpected has the same storage, set flags and values in theActual.
inline void tlrxExpectSameValues(const CDescription &theExpected, const CDescription &theActual) {
  ASSERT_EQ(theExpected.getSectionCount(), theActual.getSectionCount());
  for (int32_t s = 0; s < theExpected.getSectionCount(); ++s) {
    const CDescriptionSection &aE = *theExpected.getSection(s);
    const CDescriptionSection &aA = *theActual.getSection(s);
    ASSERT_EQ(aE.getFieldCount(), aA.getFieldCount());
    for (int32_t f = 0; f < aE.getFieldCount(); ++f) {
      const CDescriptionField &aFE = *aE.getField(f);
      const CDescriptionField &aFA = *aA.getField(f);
      SCOPED_TRACE(std::string(aE.getName()) + "." + aFE.getName());
      ASSERT_EQ(aFE.holdsValue(), aFA.holdsValue());
      if (!aFE.holdsValue() || aFE.getShape() == CTLRX_DS_MULTIPLE)
        continue;
      ASSERT_EQ(aFE.getRowNbr(), aFA.getRowNbr());
      ASSERT_EQ(aFE.getColNbr(), aFA.getColNbr());
      for (int32_t r = 0; r < aFE.getRowNbr(); ++r)
        for (int32_t c = 0; c < aFE.getColNbr(); ++c) {
          SCOPED_TRACE("cell " + std::to_string(r) + "," + std::to_string(c));
          if (aFE.getValueType() == CTLRX_DS_STRING) {
            // A string never set is written as two double quotes and read back as such.
            const std::string aText = aFE.isSet(r, c) ? aFE.getString(r, c) : "\"\"";
            ASSERT_TRUE(aFA.isSet(r, c));
            EXPECT_EQ(aText, aFA.getString(r, c));
          } else if (aFE.getValueType() == CTLRX_DS_DOUBLE) {
            EXPECT_TRUE(tlrxSameDouble(aFE.getDouble(r, c), aFA.getDouble(r, c)))
                << aFE.getDouble(r, c) << " vs " << aFA.getDouble(r, c);
          } else {
            EXPECT_EQ(aFE.getInteger(r, c), aFA.getInteger(r, c));
          }
        }
    }
  }
}
