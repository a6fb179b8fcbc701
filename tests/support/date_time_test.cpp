// Day numbers, normalisation and the text form of dates and times.
#include "support/date_time.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <string>
#include <tuple>

namespace karnet {
namespace {

auto fields(const DateTime& t) { return std::tuple(t.dayNumber, t.hours, t.minutes, t.seconds); }

std::int32_t dayNumber(int year, int month, int day) {
  return static_cast<std::int32_t>(dateToDayNumber(year, month, day));
}

TEST(DayNumberTest, BothConversionsCountEveryGregorianDayFromYear1To9999) {
  static const int kLengths[] = {31, 28, 31, 30, 31, 30, 31, 31, 30, 31, 30, 31};
  float expected = -693653.0f;  // 0001/01/01; 1900/02/28 is day 0
  for (int year = 1; year <= 9999; ++year) {
    const bool leap = (year % 4 == 0 && year % 100 != 0) || year % 400 == 0;
    for (int month = 1; month <= 12; ++month) {
      for (int day = 1; day <= kLengths[month - 1] + (month == 2 && leap); ++day, ++expected) {
        const float number = dateToDayNumber(year, month, day);
        std::int32_t y = 0, m = 0, d = 0;
        dayNumberToDate(expected, y, m, d);
        if (number != expected || y != year || m != month || d != day) {
          FAIL() << year << "/" << month << "/" << day << ": day number " << number
                 << " (expected " << expected << "), back " << y << "/" << m << "/" << d;
        }
      }
    }
  }
}

TEST(DateTimeNormaliseTest, CarriesIntoTheNextUnitWithFloorDivision) {
  const DateTime cases[][2] = {
      {{0, 0, 0, -86401}, {-2, 23, 59, 59}}, {{5, -25, 0, 0}, {3, 23, 0, 0}},
      {{10, 5, -1, 0}, {10, 4, 59, 0}},     {{7, 23, 59, 60}, {8, 0, 0, 0}},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(::testing::PrintToString(fields(c[0])));
    DateTime record = c[0];
    EXPECT_EQ(fields(dateTimeNormalise(record)), fields(c[1]));
    EXPECT_EQ(fields(record), fields(c[1]));
  }
}

TEST(DateTimeFormatTest, WritesTheNormalisedRecord) {
  char text[32];
  EXPECT_STREQ(dateTimeFormat(text, sizeof text, {0, 0, 0, -1}), "1900/02/27 23:59:59");
  // The year is right-aligned.
  EXPECT_STREQ(dateTimeFormat(text, sizeof text, {dayNumber(999, 1, 1), 0, 0, 0}),
               " 999/01/01 00:00:00");
}

TEST(DateTimeParseTest, AcceptsValidDatesAndTimesFromTheYears1800To2100) {
  struct Case {
    std::string text;
    int year, month, day, hours = 0, minutes = 0, seconds = 0;
  };
  const Case cases[] = {
      {"2000/02/29", 2000, 2, 29},          {"2001/05/31 12:30", 2001, 5, 31, 12, 30},
      {"1800/01/01 00:00:00", 1800, 1, 1},  {"2100/12/31 23:59:59", 2100, 12, 31, 23, 59, 59},
      {"2001 1 1 5 6 7", 2001, 1, 1, 5, 6, 7}, {"2001/01/01 01:02:03 99", 2001, 1, 1, 1, 2, 3},
      // The text must fit a buffer of 80 characters.
      {"2001/05/31 12:30:00" + std::string(60, ' '), 2001, 5, 31, 12, 30},
  };
  for (const Case& c : cases) {
    DateTime record;
    EXPECT_EQ(dateTimeParse(record, c.text.c_str()), 1) << c.text;
    EXPECT_EQ(fields(record),
              std::tuple(dayNumber(c.year, c.month, c.day), c.hours, c.minutes, c.seconds))
        << c.text;
  }
}

TEST(DateTimeParseTest, RejectsEverythingElseAndLeavesTheRecord) {
  const std::string rejected[] = {
      "1900/02/29", "2001/02/29", "1799/12/31 23:59:59", "2101/01/01", "2001/04/31", "2001/13/01",
      "2001/00/10", "2001/01/00", "2001/01/32", "2001/01/01 24:00:00", "2001/01/01 -1:00:00",
      "2001/01/01 00:60:00", "2001/01/01 00:00:60", "2001/05", "", "yesterday",
      "99999999999999999999/01/01", "2001/05/31 12:30:00" + std::string(61, ' ')};
  for (const std::string& text : rejected) {
    DateTime record{-5, -6, -7, -8};
    EXPECT_EQ(dateTimeParse(record, text.c_str()), 0) << text;
    EXPECT_EQ(fields(record), std::tuple(-5, -6, -7, -8)) << text;
  }
}

}  // namespace
}  // namespace karnet
