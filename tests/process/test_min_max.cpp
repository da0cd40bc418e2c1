// The min-and-max command run as a host runs it, against a direct
// computation on small stacks with no-data pixels.
#include "tlrx_header_expect.h"
#include "tlrx_command_test_support.h"

namespace {

class MinMaxTest : public CommandTest {
protected:
  void image(const std::string &theName, const std::vector<double> &theValues, const std::string &theTime,
             bool theHasNull = true, double theNull = -1, int theLines = 1) const {
    CommandTest::image(theName, theValues, theLines, theTime, theHasNull, theNull);
  }
  STLRXRun run(const std::vector<std::string> &theFiles) const {
    list(theFiles);
    resetWorking();
    return runCommand("main_min_and_max#", {file("list.txt"), file("out"), "2", "3", "4", "5", "6", "NO", "0.3"});
  }
  std::vector<double> result(const char *theSuffix) const { return CommandTest::result(std::string("out") + theSuffix); }
};

} // namespace

TEST_F(MinMaxTest, ValuesAndDatesFollowChronologicalOrderWithTiesKeptEarlyAndBadInputsAreNamed) {
  // Listed out of order; chronological order is d1, d2, d3, d4.
  image("d3", {3, 4, 5}, "01-JAN-2009 00:00:00.000000");
  image("d1", {5, 4, 1}, "01-JAN-2007 00:00:00.000000");
  image("d4", {7, 2, 9}, "05-JAN-2009 00:00:00.000000");
  image("d2", {3, 4, -1}, "01-JUN-2008 00:00:00.000000");
  ASSERT_EQ(run({"d3", "d1", "d4", "d2"}).mExitStatus, 0) << error();
  // Pixel 0: 5 3 3 7 -> min 3 at date 2, max 7 at date 4. Pixel 1: 4 4 4 2.
  // Pixel 2: no data in d2 -> null everywhere, dates 0.
  EXPECT_EQ(result("_min"), std::vector<double>({3, 2, -1}));
  EXPECT_EQ(result("_max"), std::vector<double>({7, 4, -1}));
  EXPECT_EQ(result("_min_date"), std::vector<double>({2, 4, 0}));
  EXPECT_EQ(result("_max_date"), std::vector<double>({4, 1, 0}));
  // Without a null value, 0 is no data.
  image("a", {0, 2}, "01-JAN-2007 00:00:00.000000", false);
  image("b", {1, 3}, "01-JAN-2008 00:00:00.000000", false);
  ASSERT_EQ(run({"a", "b"}).mExitStatus, 0) << error();
  EXPECT_EQ(result("_min"), std::vector<double>({0, 2}));
  EXPECT_EQ(result("_min_date"), std::vector<double>({0, 1}));
  // Size mismatches and missing or unreadable dates name the input.
  image("two", {1, 2, 3, 4}, "01-JAN-2007 00:00:00.000000", true, -1, 2);
  image("one", {1, 2, 3, 4}, "01-JAN-2008 00:00:00.000000", true, -1, 1);
  image("six", {1, 2, 3, 4, 5, 6}, "01-JAN-2009 00:00:00.000000", true, -1, 2);
  image("undated", {1, 2, 3, 4}, "", true, -1, 2);
  image("baddate", {1, 2, 3, 4}, "01-XYZ-2007 00:00:00.000000", true, -1, 2);
  expectFailure(run({"two", "one"}), 11, 652803);
  expectFailure(run({"two", "six"}), 11, 652802, file("six").substr(0, 40));
  expectFailure(run({"two", "undated"}), 14, 848642, "ACQUISITION TIME");
  EXPECT_TRUE(tlrxContains(log(), "Not found the field ACQUISITION TIME in " + file("undated")));
  EXPECT_EQ(run({"two", "baddate"}).mExitStatus, 14);
}

TEST_F(MinMaxTest, DateHeadersCarryClassNamesAndPaletteValueHeadersDoNot) {
  image("y2009", {1, 2}, "05-MAR-2009 09:30:15.500000", true, -5);
  image("y2007", {1, 2}, " 7-MAR-2007 10:00:00.000000");
  image("y2008", {1, 2}, "7-MAR-2008 10:00:00.000000");
  ASSERT_EQ(run({"y2009", "y2007", "y2008"}).mExitStatus, 0) << error();
  tlrxExpectHeader(file("out_max_date"), "DataUnits=CLASSIFICATION;ClassificationName=No classified,2007-03-07 "
                                         "10:00:00,2008-03-07 10:00:00,2009-03-05 09:30:15");
  CDescription aDate;
  fdfReadStandardHeader(file("out_max_date").c_str(), aDate);
  const CDescriptionField &aRed = aDate.getField("RasterInfo.TiffLUTRed");
  ASSERT_EQ(aRed.getNumberOfElements(), 256);
  const int32_t aGreen = aDate.getField("RasterInfo.TiffLUTGreen").getInteger(2);
  const int32_t aBlue = aDate.getField("RasterInfo.TiffLUTBlue").getInteger(2);
  EXPECT_EQ(std::vector<int32_t>({aRed.getInteger(0), aRed.getInteger(1), aGreen, aBlue, aRed.getInteger(255)}),
            std::vector<int32_t>({0, 105, 30, 160, 0}));
  // Value headers come from the first listed (2009) image and have no palette.
  tlrxExpectHeader(file("out_min"), "DataUnits=NUMBER;NullCellValue=-5;TiffLUTRed=;ClassificationName=");
}
