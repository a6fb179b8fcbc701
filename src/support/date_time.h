#ifndef KARNET_SUPPORT_DATE_TIME_H_
#define KARNET_SUPPORT_DATE_TIME_H_

#include <cstddef>
#include <cstdint>

namespace karnet {

// Day number after 1900/02/28 (day 0) and a time of day. Fields out of their
// normal range are carried into the next unit by dateTimeNormalise.
struct DateTime {
  std::int32_t dayNumber = 0;
  std::int32_t hours = 0;
  std::int32_t minutes = 0;
  std::int32_t seconds = 0;
};

struct CalendarDate {
  std::int32_t year, month, day, hours, minutes, seconds;
};

DateTime dateTimeNormalise(DateTime& dateTime);
CalendarDate dateTimeToCalendar(DateTime& dateTime);
// Writes "%4d/%02d/%02d %02d:%02d:%02d" into buffer (at least 32 chars).
char* dateTimeFormat(char* buffer, std::size_t size, const DateTime& dateTime);
// 1 when text is a valid date (1800..2100) and time; output untouched otherwise.
int dateTimeParse(DateTime& output, const char* text);
std::int32_t secondsOfDay(const DateTime& dateTime);
void dayNumberToDate(float dayNumber, std::int32_t& year, std::int32_t& month, std::int32_t& day);
float dateToDayNumber(std::int32_t year, std::int32_t month, std::int32_t day);

}  // namespace karnet

#endif  // KARNET_SUPPORT_DATE_TIME_H_
