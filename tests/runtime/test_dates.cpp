// Acquisition dates: parsing, ordering and the class-name text.
#include "tlrx_time_man_utility.h"

#include <gtest/gtest.h>

TEST(AcquisitionDate, ParsesFullAndOneDigitDaysWithBlanksAsZeros) {
  STLRXDate aDate;
  ASSERT_TRUE(fdfParseAcquisitionDate("05-MAR-2004 09:30:15.500000", aDate));
  EXPECT_EQ(fdfDateText(aDate), "2004-03-05 09:30:15");
  EXPECT_DOUBLE_EQ(aDate.mSeconds, 9 * 3600 + 30 * 60 + 15.5);
  STLRXDate aOneDigit;
  ASSERT_TRUE(fdfParseAcquisitionDate("5-MAR-2004 09:30:15.500000", aOneDigit));
  EXPECT_EQ(aOneDigit.mDay, aDate.mDay);
  ASSERT_TRUE(fdfParseAcquisitionDate(" 5-MAR-2004  9: 0: 5", aDate));
  EXPECT_EQ(fdfDateText(aDate), "2004-03-05 09:00:05");
  ASSERT_TRUE(fdfParseAcquisitionDate("01-JAN-1970 00:00:00.000000", aDate));
  EXPECT_EQ(aDate.mDay, 0);
  ASSERT_TRUE(fdfParseAcquisitionDate("29-FEB-2000 00:00:00", aDate));
  EXPECT_EQ(aDate.mDay, 11016);
}

TEST(AcquisitionDate, RejectsWhatItCannotPlaceInTime) {
  STLRXDate aDate;
  for (const char *aText : {"", "05-Mar-2004 09:30:15", "05-MAR-1969 00:00:00", "05-MAR-2101 00:00:00",
                            "31-APR-2004 00:00:00", "29-FEB-2001 00:00:00", "05/MAR/2004", "xx-MAR-2004 00:00:00",
                            "05-MAR-20a4 00:00:00"})
    EXPECT_FALSE(fdfParseAcquisitionDate(aText, aDate)) << aText;
}

TEST(AcquisitionDate, OrdersByDayThenSeconds) {
  STLRXDate aEarly, aLate, aSame;
  fdfParseAcquisitionDate("31-DEC-2007 23:59:59.000000", aEarly);
  fdfParseAcquisitionDate("01-JAN-2008 00:00:00.000000", aLate);
  fdfParseAcquisitionDate("31-DEC-2007 23:59:59.000000", aSame);
  EXPECT_TRUE(fdfDateBefore(aEarly, aLate));
  EXPECT_FALSE(fdfDateBefore(aLate, aEarly));
  EXPECT_FALSE(fdfDateBefore(aEarly, aSame));
  EXPECT_FALSE(fdfDateBefore(aSame, aEarly));
}
