// Day numbers after 1900/02/28, calendar dates and their text form.
//
// The calendar conversions keep every intermediate value in a 32-bit float:
// each step is evaluated in double precision and rounded to float before the
// next one uses it. Over the years 1 to 9999 all intermediates are whole
// numbers below 2^24, so the steps are exact there.
#include "support/date_time.h"

#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace karnet {
namespace {

constexpr std::size_t kParseBufferSize = 80;

// Floor division: the remainder takes the divisor's sign.
void floorDivide(std::int64_t value, std::int64_t divisor, std::int64_t& quotient,
                 std::int64_t& remainder) {
  quotient = value / divisor;
  remainder = value % divisor;
  if (remainder < 0) {
    remainder += divisor;
    quotient -= 1;
  }
}

// int() of the conversions: truncation toward zero, kept as a double.
double whole(double value) { return std::trunc(value); }

// Truncation to a 32-bit integer that stays defined for any value.
std::int32_t toInt32(double value) {
  if (std::isnan(value)) return 0;
  const double truncated = std::trunc(value);
  if (truncated <= static_cast<double>(INT32_MIN)) return INT32_MIN;
  if (truncated >= static_cast<double>(INT32_MAX)) return INT32_MAX;
  return static_cast<std::int32_t>(truncated);
}

bool isLeapYear(long year) { return (year % 4 == 0 && year % 100 != 0) || year % 400 == 0; }

}  // namespace

DateTime dateTimeNormalise(DateTime& dateTime) {
  // Carries are formed in 64 bits; the stored fields keep their 32-bit width.
  std::int64_t carry = 0;
  std::int64_t remainder = 0;
  floorDivide(dateTime.seconds, 60, carry, remainder);
  dateTime.seconds = static_cast<std::int32_t>(remainder);
  floorDivide(std::int64_t{dateTime.minutes} + carry, 60, carry, remainder);
  dateTime.minutes = static_cast<std::int32_t>(remainder);
  floorDivide(std::int64_t{dateTime.hours} + carry, 24, carry, remainder);
  dateTime.hours = static_cast<std::int32_t>(remainder);
  dateTime.dayNumber = static_cast<std::int32_t>(std::int64_t{dateTime.dayNumber} + carry);
  return dateTime;
}

CalendarDate dateTimeToCalendar(DateTime& dateTime) {
  dateTimeNormalise(dateTime);
  CalendarDate date{};
  dayNumberToDate(static_cast<float>(dateTime.dayNumber), date.year, date.month, date.day);
  date.hours = dateTime.hours;
  date.minutes = dateTime.minutes;
  date.seconds = dateTime.seconds;
  return date;
}

char* dateTimeFormat(char* buffer, std::size_t size, const DateTime& dateTime) {
  DateTime copy = dateTime;
  const CalendarDate date = dateTimeToCalendar(copy);
  std::snprintf(buffer, size, "%4d/%02d/%02d %02d:%02d:%02d", date.year, date.month, date.day,
                date.hours, date.minutes, date.seconds);
  return buffer;
}

int dateTimeParse(DateTime& output, const char* text) {
  if (text == nullptr) return 0;
  char buffer[kParseBufferSize];
  const std::size_t length = std::strlen(text);
  if (length >= sizeof buffer) return 0;
  std::memcpy(buffer, text, length + 1);
  for (char* c = buffer; *c != '\0'; ++c) {
    if (*c == '/' || *c == ':') *c = ' ';
  }

  // Up to six decimal integers, read as "%ld" reads them; out-of-range
  // numbers saturate and then fail the range checks below.
  long values[6] = {0, 0, 0, 0, 0, 0};
  int count = 0;
  const char* cursor = buffer;
  while (count < 6) {
    char* end = nullptr;
    const long value = std::strtol(cursor, &end, 10);
    if (end == cursor) break;
    values[count++] = value;
    cursor = end;
  }
  if (count < 3) return 0;

  const long year = values[0];
  const long month = values[1];
  const long day = values[2];
  const long hours = values[3];
  const long minutes = values[4];
  const long seconds = values[5];
  if (year < 1800 || year > 2100) return 0;
  if (month < 1 || month > 12) return 0;
  if (day < 1 || day > 31) return 0;
  if (hours < 0 || hours > 23) return 0;
  if (minutes < 0 || minutes > 59) return 0;
  if (seconds < 0 || seconds > 59) return 0;
  if (month == 2 && day > (isLeapYear(year) ? 29 : 28)) return 0;
  if ((month == 4 || month == 6 || month == 9 || month == 11) && day == 31) return 0;

  const float dayNumber = dateToDayNumber(static_cast<std::int32_t>(year),
                                          static_cast<std::int32_t>(month),
                                          static_cast<std::int32_t>(day));
  output.dayNumber = toInt32(dayNumber);
  output.hours = static_cast<std::int32_t>(hours);
  output.minutes = static_cast<std::int32_t>(minutes);
  output.seconds = static_cast<std::int32_t>(seconds);
  return 1;
}

std::int32_t secondsOfDay(const DateTime& dateTime) {
  // 32-bit result as stated; formed in 64 bits so that odd records cannot overflow.
  const std::int64_t seconds =
      (std::int64_t{dateTime.hours} * 60 + dateTime.minutes) * 60 + dateTime.seconds;
  return static_cast<std::int32_t>(seconds);
}

void dayNumberToDate(float dayNumber, std::int32_t& year, std::int32_t& month,
                     std::int32_t& day) {
  const double d = dayNumber;
  float t = static_cast<float>((d + 693960.0) * 4.0 - 1.0);
  const float cy = static_cast<float>(whole(t / 146097.0));
  t = static_cast<float>(t - cy * 146097.0);
  t = static_cast<float>(whole(t * 0.25) * 4.0 + 3.0);
  const float y = static_cast<float>(whole(t / 1461.0));
  t = static_cast<float>(t - y * 1461.0);
  t = static_cast<float>(whole((t + 4.0) * 0.25) * 5.0 - 3.0);
  const float m = static_cast<float>(whole(t / 153.0));
  t = static_cast<float>(t - m * 153.0);
  day = toInt32((t + 5.0) / 5.0);
  float yearValue = static_cast<float>(cy * 100.0 + y);
  float monthValue;
  if (m < 10.0f) {
    monthValue = static_cast<float>(m + 3.0);
  } else {
    monthValue = static_cast<float>(m - 9.0);
    yearValue = static_cast<float>(yearValue + 1.0);
  }
  year = toInt32(yearValue);
  month = toInt32(monthValue);
}

float dateToDayNumber(std::int32_t year, std::int32_t month, std::int32_t day) {
  std::int64_t shiftedMonth;
  std::int64_t shiftedYear;
  if (month > 2) {
    shiftedMonth = month - 3;
    shiftedYear = year;
  } else {
    shiftedMonth = month + 9;
    shiftedYear = year - 1;
  }
  const double cy = whole(shiftedYear / 100.0);
  const double a = whole(shiftedYear - cy * 100.0);
  const float centuryDays = static_cast<float>((cy - 19.0) * 36524.0 + whole(cy * 0.25) - 4.0);
  const float yearDays = static_cast<float>(centuryDays + a * 365.0 + whole(a * 0.25));
  const double monthDays = whole((shiftedMonth * 153.0 + 2.0) / 5.0);
  float result = yearDays + static_cast<float>(monthDays);
  result = result + static_cast<float>(day);
  return result;
}

}  // namespace karnet
