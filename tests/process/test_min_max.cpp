// The min-and-max command run as a host runs it, against a direct
// computation on small stacks with no-data pixels.
#include "tlrx_command_test_support.h"
#include "tlrx_standard_header.h"

namespace {

class MinMaxTest : public CommandTest {
protected:
  void image(const std::string &theName, const std::vector<double> &theValues, const std::string &theTime,
             bool theHasNull = true, double theNull = -1, int theLines = 1) const {
    CommandTest::image(theName, theValues, theLines, theTime, theHasNull, theNull);
  }
  STLRXRun run(const std::vector<std::string> &theFiles) const {
    list(theFiles);
    return runCommand("main_min_and_max#", {file("list.txt"), file("out"), "2", "3", "4", "5", "6", "NO", "0.3"});
  }
  std::vector<double> result(const char *theSuffix) const { return CommandTest::result(std::string("out") + theSuffix); }
};

} // namespace

TEST_F(MinMaxTest, ValuesAndDatesFollowChronologicalOrderWithTiesKeptEarly) {
  // Listed out of order; chronological order is d1, d2, d3, d4.
  image("d3", {3, 4, 5}, "01-JAN-2009 00:00:00.000000");
  image("d1", {5, 4, 1}, "01-JAN-2007 00:00:00.000000");
  image("d4", {7, 2, 9}, "05-JAN-2009 00:00:00.000000");
  image("d2", {3, 4, -1}, "01-JUN-2008 00:00:00.000000");
  const STLRXRun aRun = run({"d3", "d1", "d4", "d2"});
  ASSERT_EQ(aRun.mExitStatus, 0) << aRun.mOutput << error();
  // Pixel 0: 5 3 3 7 -> min 3 at date 2, max 7 at date 4. Pixel 1: 4 4 4 2.
  // Pixel 2: no data in d2 -> null everywhere, dates 0.
  EXPECT_EQ(result("_min"), std::vector<double>({3, 2, -1}));
  EXPECT_EQ(result("_max"), std::vector<double>({7, 4, -1}));
  EXPECT_EQ(result("_min_date"), std::vector<double>({2, 4, 0}));
  EXPECT_EQ(result("_max_date"), std::vector<double>({4, 1, 0}));
}

TEST_F(MinMaxTest, DateHeadersCarryClassNamesAndPaletteValueHeadersDoNot) {
  image("y2009", {1, 2}, "05-MAR-2009 09:30:15.500000", true, -5);
  image("y2007", {1, 2}, " 7-MAR-2007 10:00:00.000000");
  image("y2008", {1, 2}, "7-MAR-2008 10:00:00.000000");
  ASSERT_EQ(run({"y2009", "y2007", "y2008"}).mExitStatus, 0) << error();
  CDescription aDate, aValue;
  fdfReadStandardHeader(file("out_max_date").c_str(), aDate);
  fdfReadStandardHeader(file("out_min").c_str(), aValue);
  EXPECT_STREQ(aDate.getField("RasterInfo.DataUnits").getString(), "CLASSIFICATION");
  const CDescriptionField &aNames = aDate.getField("RasterInfo.ClassificationName");
  ASSERT_EQ(aNames.getNumberOfElements(), 4);
  EXPECT_STREQ(aNames.getString(0), "No classified");
  EXPECT_STREQ(aNames.getString(1), "2007-03-07 10:00:00");
  EXPECT_STREQ(aNames.getString(2), "2008-03-07 10:00:00");
  EXPECT_STREQ(aNames.getString(3), "2009-03-05 09:30:15");
  const CDescriptionField &aRed = aDate.getField("RasterInfo.TiffLUTRed");
  ASSERT_EQ(aRed.getNumberOfElements(), 256);
  EXPECT_EQ(aRed.getInteger(0), 0);
  EXPECT_EQ(aRed.getInteger(1), 105);
  EXPECT_EQ(aDate.getField("RasterInfo.TiffLUTGreen").getInteger(2), 30);
  EXPECT_EQ(aDate.getField("RasterInfo.TiffLUTBlue").getInteger(2), 160);
  EXPECT_EQ(aRed.getInteger(255), 0);
  // Value headers come from the first listed (2009) image and have no palette.
  EXPECT_STREQ(aValue.getField("RasterInfo.DataUnits").getString(), "NUMBER");
  EXPECT_EQ(aValue.getField("RasterInfo.NullCellValue").getDouble(), -5);
  EXPECT_FALSE(aValue.getField("RasterInfo.TiffLUTRed").holdsValue());
  EXPECT_FALSE(aValue.findField("RasterInfo.ClassificationName")->holdsValue());
}

TEST_F(MinMaxTest, MissingNullCellValueMakesZeroNoData) {
  image("a", {0, 2}, "01-JAN-2007 00:00:00.000000", false);
  image("b", {1, 3}, "01-JAN-2008 00:00:00.000000", false);
  ASSERT_EQ(run({"a", "b"}).mExitStatus, 0) << error();
  EXPECT_EQ(result("_min"), std::vector<double>({0, 2}));
  EXPECT_EQ(result("_min_date"), std::vector<double>({0, 1}));
}

TEST_F(MinMaxTest, SizeMismatchesAreReportedWithTheInputName) {
  image("a", {1, 2, 3, 4}, "01-JAN-2007 00:00:00.000000", true, -1, 2);
  image("b", {1, 2, 3, 4}, "01-JAN-2008 00:00:00.000000", true, -1, 1);
  expectFailure(run({"a", "b"}), 11, 652803);
  image("c", {1, 2, 3, 4, 5, 6}, "01-JAN-2009 00:00:00.000000", true, -1, 2);
  resetWorking();
  expectFailure(run({"a", "c"}), 11, 652802, file("c").substr(0, 40));
}

TEST_F(MinMaxTest, MissingOrUnreadableDateIsADescriptionError) {
  image("a", {1, 2}, "01-JAN-2007 00:00:00.000000");
  image("b", {1, 2}, "");
  expectFailure(run({"a", "b"}), 14, 848642, "ACQUISITION TIME");
  EXPECT_TRUE(tlrxContains(log(), "Not found the field ACQUISITION TIME in " + file("b")));
  image("c", {1, 2}, "01-XYZ-2007 00:00:00.000000");
  resetWorking();
  EXPECT_EQ(run({"a", "c"}).mExitStatus, 14);
}
