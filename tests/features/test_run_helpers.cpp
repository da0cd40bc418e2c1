// Helpers of the commands: the orders of dated inputs and the setters of
// result headers.
#include "main_coherence.h"
#include "tlrx_acquisition_dates.h"
#include "tlrx_description_test_support.h"
#include "tlrx_description_xml.h"
#include "tlrx_step_common.h"

#include <gtest/gtest.h>

#include <functional>

// Guards the temporal command's order: it once shared the min-and-max order,
// which moves an afternoon image before a morning one of the same day.
TEST(AcquisitionDates, ExchangeSortComparesDaysOrDaysThenSeconds) {
  const struct {
    ETLRXDateOrder mOrder;
    std::vector<std::string> mExpected;
  } aCases[] = {
      {ETLRXDateOrder::kDayNumber, {"d1_pm", "d1_am", "d2", "d5"}},
      {ETLRXDateOrder::kDayThenSeconds, {"d1_am", "d1_pm", "d2", "d5"}},
  };
  for (const auto &aCase : aCases) {
    std::vector<STLRXDate> aDates = {{5, 0}, {1, 50000}, {2, 10}, {1, 100}}; // day, seconds
    std::vector<std::string> aNames = {"d5", "d1_pm", "d2", "d1_am"};
    fdfSortByDate(aDates, aNames, aCase.mOrder);
    EXPECT_EQ(aNames, aCase.mExpected);
    for (size_t i = 0; i + 1 < aDates.size(); ++i)
      EXPECT_LE(aDates[i].mDay, aDates[i + 1].mDay);
  }
}

// Guards the setters: a key the header does not declare was once skipped,
// leaving a result header without the value and no word about it.
TEST(ResultHeaderSetters, AnUndeclaredKeyIsAMissingFieldNamingTheKey) {
  CTempDir aDir;
  tlrxStartLibraryEnvironment(aDir.path());
  CDescription aHeader;
  tlrxDeclare(aHeader, aDir.path(), "[RasterInfo]\nCellType = S\nLines = I\nNames = VS\n", {"RasterInfo"});
  const struct {
    const char *mKey;
    std::function<void(const char *)> mSet;
  } aCases[] = {
      {"RasterInfo.CellType", [&](const char *theKey) { fdfSetHeaderText(aHeader, theKey, "FLOAT"); }},
      {"RasterInfo.Lines", [&](const char *theKey) { fdfSetHeaderNumber(aHeader, theKey, 12); }},
      {"RasterInfo.Names", [&](const char *theKey) { fdfSetHeaderList(aHeader, theKey, {"a", "b"}); }},
  };
  for (const auto &aCase : aCases) {
    EXPECT_EQ(tlrxCodeOf([&] { aCase.mSet(aCase.mKey); }), 0) << aCase.mKey;
    EXPECT_TRUE(aHeader.findField(aCase.mKey)->holdsValue()) << aCase.mKey;
    std::string aMessage;
    EXPECT_EQ(tlrxCodeOf([&] { aCase.mSet("RasterInfo.Undeclared"); }, &aMessage), CTLRX_ERR_DS_FIELD_MISSING);
    EXPECT_EQ(aMessage, "RasterInfo.Undeclared");
  }
  EXPECT_EQ(tlrxCodeOf([&] { fdfSetHeaderNumber(aHeader, "RasterInfo.Lines", 1e10); }), CTLRX_ERR_DS_TYPE);
}

// The acquisition time is found in whichever row of "OtherInfo" holds it,
// by its key as a prefix; no row, no value.
TEST(ResultHeaderSetters, OtherInfoRowsAreSearchedWholeByKeyPrefix) {
  CTempDir aDir;
  tlrxStartLibraryEnvironment(aDir.path());
  CDescription aHeader;
  tlrxDeclare(aHeader, aDir.path(), "[RasterInfo]\nOtherInfo = MS\n", {"RasterInfo"});
  std::string aValue = "unchanged";
  EXPECT_FALSE(fdfFindOtherInfo(aHeader, CTLRX_ACQUISITION_TIME_KEY, aValue));
  fdfStampOtherInfo(aHeader, "SOFTWARE", "x");
  fdfStampOtherInfo(aHeader, "SENSOR", "y");
  EXPECT_FALSE(fdfFindOtherInfo(aHeader, CTLRX_ACQUISITION_TIME_KEY, aValue));
  EXPECT_EQ(aValue, "unchanged");
  fdfStampOtherInfo(aHeader, "ACQUISITION TIME UTC", "05-MAR-2004 09:30:15.500000");
  ASSERT_TRUE(fdfFindOtherInfo(aHeader, CTLRX_ACQUISITION_TIME_KEY, aValue));
  EXPECT_EQ(aValue, "05-MAR-2004 09:30:15.500000");
}

// The coherence command's names: "_cc" and "_slc" cut exactly, else
// regardless of case, only at the end; the power images in the root's folder.
TEST(CoherenceNames, SuffixesAreCutAtTheEndAndPowerImagesFollowTheRoot) {
  const struct {
    const char *mName, *mSuffix, *mCut;
  } aCuts[] = {{"out_cc", "_cc", "out"}, {"out_CC", "_cc", "out"}, {"out_Cc", "_cc", "out"}, {"out_ccx", "_cc", "out_ccx"},
               {"_cc", "_cc", ""}, {"cc", "_cc", "cc"}, {"a_cc_cc", "_cc", "a_cc"}, {"m_SLC", "_slc", "m"}};
  for (const auto &aCut : aCuts)
    EXPECT_EQ(fdfCutSuffix(aCut.mName, aCut.mSuffix), aCut.mCut) << aCut.mName;
  const struct {
    const char *mRoot, *mMaster, *mSlave, *mR, *mFolder, *mMasterPower, *mSlavePower;
  } aCases[] = {
      {"out_cc", "D:\\data\\m_slc", "D:\\data\\s_slc", "out", "", "m_pwr", "s_pwr"},
      {"/w/res/pair_CC", "/in/a.b/m.raw", "/in/s_Slc.raw", "/w/res/pair", "/w/res/", "/w/res/m_pwr", "/w/res/s_pwr"},
      {"/w/x", "m_slc_slc", "/in/s", "/w/x", "/w/", "/w/m_slc_pwr", "/w/s_pwr"},
  };
  for (const auto &aCase : aCases) {
    const SCoherenceNames aNames = fdfCoherenceNames(aCase.mRoot, aCase.mMaster, aCase.mSlave);
    EXPECT_EQ(aNames.mRoot, aCase.mR);
    EXPECT_EQ(aNames.mFolder, aCase.mFolder);
    EXPECT_EQ(aNames.mMasterPower, aCase.mMasterPower);
    EXPECT_EQ(aNames.mSlavePower, aCase.mSlavePower);
  }
}

// The plan 0, 9, 10, [2], 1, [3]; with the split off the orbit method picks
// 6 or 7 before the phase slope 8, and any other method is refused.
TEST(CoherencePlan, SwitchesAddTheFilterAndTheCopy) {
  const struct {
    bool mSplit;
    int mMethod;
    bool mFilter, mTiff;
    std::vector<int> mPlan;
  } aCases[] = {{true, 5, true, true, {0, 9, 10, 2, 1, 3}}, {true, 0, false, false, {0, 9, 10, 1}},
                {true, 0, true, false, {0, 9, 10, 2, 1}},   {true, 0, false, true, {0, 9, 10, 1, 3}},
                {false, 0, false, false, {0, 6, 8, 1}},     {false, 1, true, true, {0, 7, 8, 2, 1, 3}}};
  for (const auto &aCase : aCases)
    EXPECT_EQ(fdfCoherencePlan(aCase.mSplit, aCase.mMethod, aCase.mFilter, aCase.mTiff), aCase.mPlan);
  for (int aMethod : {-1, 2})
    EXPECT_EQ(tlrxCodeOf([&] { fdfCoherencePlan(false, aMethod, false, false); }), 456960) << aMethod;
}
