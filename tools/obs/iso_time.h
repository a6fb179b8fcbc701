#ifndef KARNET_TOOLS_OBS_ISO_TIME_H_
#define KARNET_TOOLS_OBS_ISO_TIME_H_

#include <string_view>

namespace karnet::obs {

// Days from 1950-01-01 to the given day of the proleptic Gregorian calendar.
long long daysSince1950(int year, int month, int day);

// Reads an ISO 8601 date or date and time in UTC: "2007-05-12", "2007-05-12T10:30",
// "2007-05-12 10:30:15.5", with an optional "Z", "UTC" or offset from UTC ("+02:00", "-0330")
// after a time. Gives the time as days
// since 1950-01-01 00:00 UTC, and whether only a date was given. False for anything else,
// impossible dates and times included.
bool parseIsoTime(std::string_view text, double* days, bool* dateOnly = nullptr);

// The reference of a CF time unit in days: "days since 1950-01-01 00:00:00 UTC" gives 0,
// "days since 1970-01-01" 7305. False when the unit is not "days since <ISO time>".
bool parseDaysSinceUnit(std::string_view unit, double* referenceDays);

}  // namespace karnet::obs

#endif  // KARNET_TOOLS_OBS_ISO_TIME_H_
