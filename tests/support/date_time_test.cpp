// Day numbers, normalisation and the text form of dates and times.
#include "support/date_time.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <string>

namespace karnet {
namespace {

// Days since 1970/01/01 in the proleptic Gregorian calendar, by era counting:
// an independent reference for the day-number conversions.
std::int64_t daysFromCivil(std::int64_t year, int month, int day) {
  year -= month <= 2 ? 1 : 0;
  const std::int64_t era = (year >= 0 ? year : year - 399) / 400;
  const std::int64_t yearOfEra = year - era * 400;
  const std::int64_t dayOfYear = (153 * (month > 2 ? month - 3 : month + 9) + 2) / 5 + day - 1;
  const std::int64_t dayOfEra = yearOfEra * 365 + yearOfEra / 4 - yearOfEra / 100 + dayOfYear;
  return era * 146097 + dayOfEra - 719468;
}

std::int64_t referenceDayNumber(std::int64_t year, int month, int day) {
  return daysFromCivil(year, month, day) - daysFromCivil(1900, 2, 28);
}

bool leapYear(int year) { return (year % 4 == 0 && year % 100 != 0) || year % 400 == 0; }

int monthLength(int year, int month) {
  static const int kLengths[] = {31, 28, 31, 30, 31, 30, 31, 31, 30, 31, 30, 31};
  return month == 2 && leapYear(year) ? 29 : kLengths[month - 1];
}

TEST(DayNumberTest, KnownDates) {
  struct Case {
    int year, month, day;
    float dayNumber;
  };
  const Case cases[] = {{1900, 2, 28, 0.0f},    {1900, 3, 1, 1.0f},     {1900, 1, 1, -58.0f},
                        {2000, 1, 1, 36466.0f}, {2010, 6, 15, 40284.0f}, {1, 1, 1, -693653.0f},
                        {9999, 12, 31, 2958405.0f}};
  for (const Case& c : cases) {
    EXPECT_EQ(dateToDayNumber(c.year, c.month, c.day), c.dayNumber) << c.year << "/" << c.month;
    std::int32_t year = 0, month = 0, day = 0;
    dayNumberToDate(c.dayNumber, year, month, day);
    EXPECT_EQ(year, c.year) << c.dayNumber;
    EXPECT_EQ(month, c.month) << c.dayNumber;
    EXPECT_EQ(day, c.day) << c.dayNumber;
  }
}

TEST(DayNumberTest, BothConversionsFollowTheGregorianCalendarFromYear1To9999) {
  int mismatches = 0;
  for (int year = 1; year <= 9999; ++year) {
    for (int month = 1; month <= 12; ++month) {
      for (int day = 1; day <= monthLength(year, month); ++day) {
        const auto expected = static_cast<float>(referenceDayNumber(year, month, day));
        const float dayNumber = dateToDayNumber(year, month, day);
        std::int32_t y = 0, m = 0, d = 0;
        dayNumberToDate(expected, y, m, d);
        if (dayNumber != expected || y != year || m != month || d != day) {
          if (++mismatches <= 5) {
            ADD_FAILURE() << year << "/" << month << "/" << day << ": day number " << dayNumber
                          << " (expected " << expected << "), back " << y << "/" << m << "/" << d;
          }
        }
      }
    }
  }
  EXPECT_EQ(mismatches, 0);
}

TEST(DateTimeNormaliseTest, CarriesIntoTheNextUnitWithFloorDivision) {
  struct Case {
    DateTime in;
    DateTime out;
  };
  const Case cases[] = {
      {{10, 5, 20, 75}, {10, 5, 21, 15}},
      {{10, 5, 20, -1}, {10, 5, 19, 59}},
      {{10, 5, -1, 0}, {10, 4, 59, 0}},
      {{10, 24, 0, 0}, {11, 0, 0, 0}},
      {{0, 0, 0, -1}, {-1, 23, 59, 59}},
      {{0, 0, 0, 3 * 86400 + 5}, {3, 0, 0, 5}},
      {{0, 0, 0, -86401}, {-2, 23, 59, 59}},
      {{5, -25, 0, 0}, {3, 23, 0, 0}},
      {{7, 23, 59, 60}, {8, 0, 0, 0}},
  };
  for (const Case& c : cases) {
    DateTime record = c.in;
    const DateTime copy = dateTimeNormalise(record);
    for (const DateTime& result : {record, copy}) {
      EXPECT_EQ(result.dayNumber, c.out.dayNumber) << c.in.seconds << " " << c.in.minutes;
      EXPECT_EQ(result.hours, c.out.hours) << c.in.seconds << " " << c.in.minutes;
      EXPECT_EQ(result.minutes, c.out.minutes) << c.in.seconds << " " << c.in.minutes;
      EXPECT_EQ(result.seconds, c.out.seconds) << c.in.seconds << " " << c.in.minutes;
    }
  }
}

TEST(DateTimeNormaliseTest, CalendarConversionNormalisesTheCallersRecord) {
  DateTime record{36466, 0, 0, -1};
  const CalendarDate date = dateTimeToCalendar(record);
  EXPECT_EQ(record.dayNumber, 36465);
  EXPECT_EQ(record.seconds, 59);
  EXPECT_EQ(date.year, 1999);
  EXPECT_EQ(date.month, 12);
  EXPECT_EQ(date.day, 31);
  EXPECT_EQ(date.hours, 23);
  EXPECT_EQ(date.minutes, 59);
  EXPECT_EQ(date.seconds, 59);
}

TEST(DateTimeFormatTest, WritesYearMonthDayAndTimeWithoutChangingTheRecord) {
  char text[32];
  DateTime zero{};
  EXPECT_STREQ(dateTimeFormat(text, sizeof text, zero), "1900/02/28 00:00:00");

  DateTime before{0, 0, 0, -1};
  EXPECT_STREQ(dateTimeFormat(text, sizeof text, before), "1900/02/27 23:59:59");
  EXPECT_EQ(before.seconds, -1);
  EXPECT_EQ(before.dayNumber, 0);

  DateTime leapDay{static_cast<std::int32_t>(referenceDayNumber(2000, 2, 29)), 13, 7, 9};
  EXPECT_STREQ(dateTimeFormat(text, sizeof text, leapDay), "2000/02/29 13:07:09");

  // The year is right-aligned in four places.
  DateTime early{static_cast<std::int32_t>(referenceDayNumber(999, 1, 1)), 0, 0, 0};
  EXPECT_STREQ(dateTimeFormat(text, sizeof text, early), " 999/01/01 00:00:00");
}

struct ParseCase {
  const char* text;
  int result;
  int year = 0, month = 0, day = 0, hours = 0, minutes = 0, seconds = 0;
};

TEST(DateTimeParseTest, AcceptsOnlyValidDatesAndTimes) {
  const ParseCase cases[] = {
      {"2000/02/29", 1, 2000, 2, 29, 0, 0, 0},
      {"2004/02/29 01:02:03", 1, 2004, 2, 29, 1, 2, 3},
      {"1900/02/29", 0},
      {"2100/02/29", 0},
      {"2001/02/29", 0},
      {"2000/02/29 12", 1, 2000, 2, 29, 12, 0, 0},
      {"1799/12/31 23:59:59", 0},
      {"2101/01/01", 0},
      {"1800/01/01 00:00:00", 1, 1800, 1, 1, 0, 0, 0},
      {"2100/12/31 23:59:59", 1, 2100, 12, 31, 23, 59, 59},
      {"2001/04/31", 0},
      {"2001/06/31", 0},
      {"2001/09/31", 0},
      {"2001/11/31", 0},
      {"2001/05/31", 1, 2001, 5, 31, 0, 0, 0},
      {"2001/05/31 12:30", 1, 2001, 5, 31, 12, 30, 0},
      {"2001/05", 0},
      {"", 0},
      {"yesterday", 0},
      {"2001/13/01", 0},
      {"2001/00/10", 0},
      {"2001/01/00", 0},
      {"2001/01/32", 0},
      {"2001/01/01 24:00:00", 0},
      {"2001/01/01 -1:00:00", 0},
      {"2001/01/01 00:60:00", 0},
      {"2001/01/01 00:00:60", 0},
      {"2001 1 1 5 6 7", 1, 2001, 1, 1, 5, 6, 7},
      {"2001/01/01 01:02:03 99", 1, 2001, 1, 1, 1, 2, 3},
      {"99999999999999999999/01/01", 0},
  };
  for (const ParseCase& c : cases) {
    DateTime record{-5, -6, -7, -8};
    EXPECT_EQ(dateTimeParse(record, c.text), c.result) << c.text;
    if (c.result == 0) {
      EXPECT_EQ(record.dayNumber, -5) << c.text;
      EXPECT_EQ(record.hours, -6) << c.text;
      EXPECT_EQ(record.minutes, -7) << c.text;
      EXPECT_EQ(record.seconds, -8) << c.text;
      continue;
    }
    EXPECT_EQ(record.dayNumber, referenceDayNumber(c.year, c.month, c.day)) << c.text;
    EXPECT_EQ(record.hours, c.hours) << c.text;
    EXPECT_EQ(record.minutes, c.minutes) << c.text;
    EXPECT_EQ(record.seconds, c.seconds) << c.text;
  }
}

TEST(DateTimeParseTest, TextMustFitTheEightyCharacterBuffer) {
  std::string text = "2001/05/31 12:30:00";
  text.resize(79, ' ');
  DateTime record;
  EXPECT_EQ(dateTimeParse(record, text.c_str()), 1);
  text.push_back(' ');
  EXPECT_EQ(dateTimeParse(record, text.c_str()), 0);
  EXPECT_EQ(dateTimeParse(record, std::string(5000, '1').c_str()), 0);
}

TEST(DateTimeParseTest, FormattedRecordsParseBackToThemselves) {
  const DateTime records[] = {{0, 0, 0, 0}, {-58, 6, 30, 0}, {36466, 23, 59, 59}, {73049, 12, 0, 1}};
  for (const DateTime& original : records) {
    char text[32];
    dateTimeFormat(text, sizeof text, original);
    DateTime parsed{1, 1, 1, 1};
    ASSERT_EQ(dateTimeParse(parsed, text), 1) << text;
    EXPECT_EQ(parsed.dayNumber, original.dayNumber) << text;
    EXPECT_EQ(parsed.hours, original.hours) << text;
    EXPECT_EQ(parsed.minutes, original.minutes) << text;
    EXPECT_EQ(parsed.seconds, original.seconds) << text;
  }
}

TEST(SecondsOfDayTest, CountsWithoutNormalising) {
  EXPECT_EQ(secondsOfDay(DateTime{7, 0, 0, 0}), 0);
  EXPECT_EQ(secondsOfDay(DateTime{7, 23, 59, 59}), 86399);
  EXPECT_EQ(secondsOfDay(DateTime{0, 25, 61, 70}), (25 * 60 + 61) * 60 + 70);
  EXPECT_EQ(secondsOfDay(DateTime{0, 0, -1, 0}), -60);
}

}  // namespace
}  // namespace karnet
