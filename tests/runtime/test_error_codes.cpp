// The code table is the one list of numbered codes: the catalogue holds a
// text for each of its codes and no other, and the README's exit-status
// table is derived from it.
#include "tlrx_errors.h"
#include "tlrx_platform.h"
#include "tlrx_test_support.h"

#include <gtest/gtest.h>

#include <map>
#include <set>
#include <sstream>

namespace {

const std::string sCatalogue = tlrxDataDir() + "/des_files/tlrx_errors_catalog.des";

// "a-b" for runs of consecutive codes, joined by ", ".
std::string tlrxCodeRanges(const std::vector<int32_t> &theCodes) {
  std::string aText;
  for (size_t i = 0; i < theCodes.size();) {
    size_t j = i;
    while (j + 1 < theCodes.size() && theCodes[j + 1] == theCodes[j] + 1)
      ++j;
    aText += (aText.empty() ? "" : ", ") + std::to_string(theCodes[i]) +
             (j > i ? "-" + std::to_string(theCodes[j]) : "");
    i = j + 1;
  }
  return aText;
}

// The meaning of each class: the second field of its line in the
// catalogue's CLASSES block.
std::vector<std::string> tlrxClassMeanings() {
  std::vector<std::string> aMeanings;
  const std::vector<std::string> aLines = tlrxReadLines(sCatalogue);
  for (size_t i = 2; i < aLines.size() && aLines[i] != "TEXTS"; ++i)
    aMeanings.push_back(aLines[i].substr(aLines[i].find(" , ") + 3));
  return aMeanings;
}

// The README's exit-status table as the code table makes it.
std::string tlrxExitStatusTable() {
  std::map<int, std::vector<int32_t>> aByStatus;
  for (const STLRXErrorCode &aEntry : CTLRX_ERROR_CODE_TABLE)
    aByStatus[fdfExitStatus(aEntry.mCode)].push_back(aEntry.mCode);
  const std::vector<std::string> aMeanings = tlrxClassMeanings();
  std::ostringstream aTable;
  aTable << "| exit status | codes | meaning |\n|---|---|---|\n| 0 | 0 | success |\n";
  for (const auto &aRow : aByStatus)
    aTable << "| " << aRow.first << " | " << tlrxCodeRanges(aRow.second) << " | "
           << aMeanings.at(static_cast<size_t>(fdfGetPEC(aRow.second.front()))) << " |\n";
  return aTable.str();
}

} // namespace

TEST(ErrorCodes, TableAndCatalogueNameTheSameCodesOnce) {
  CErrorCatalogue aCatalogue;
  ASSERT_TRUE(aCatalogue.load(sCatalogue.c_str()));
  std::set<int32_t> aTable;
  std::set<std::string> aNames;
  for (const STLRXErrorCode &aEntry : CTLRX_ERROR_CODE_TABLE) {
    EXPECT_TRUE(aTable.insert(aEntry.mCode).second) << "two names for " << aEntry.mCode;
    EXPECT_TRUE(aNames.insert(aEntry.mName).second) << aEntry.mName;
    const int32_t aPEC = fdfGetPEC(aEntry.mCode), aSEC = fdfGetSEC(aEntry.mCode);
    ASSERT_LT(aPEC, aCatalogue.mPECNbr) << aEntry.mName;
    // A class's own code (SEC -1) has the class text; the others a line of
    // their block.
    EXPECT_LT(aSEC, aCatalogue.mSECNbr[aPEC]) << aEntry.mName << " has no catalogue text";
  }
  for (int32_t aPEC = 0; aPEC < aCatalogue.mPECNbr; ++aPEC)
    for (int32_t aSEC = 0; aSEC < aCatalogue.mSECNbr[aPEC]; ++aSEC)
      EXPECT_EQ(aTable.count(fdfErrorCode(aPEC, aSEC)), 1u) << fdfErrorCode(aPEC, aSEC) << " has no name";
}

TEST(ErrorCodes, ReadmeExitStatusTableIsDerivedFromTheCodeTable) {
  EXPECT_EQ(tlrxCodeRanges({1, 2, 3, 5, 7, 8}), "1-3, 5, 7-8");
  const std::string aTable = tlrxExitStatusTable();
  EXPECT_NE(tlrxReadFile(std::string(TLRX_TEST_SOURCE_DIR) + "/README.md").find(aTable), std::string::npos)
      << "the README's table should read:\n"
      << aTable;
}
