#include "obs/iso_time.h"

#include <cctype>
#include <string>

namespace karnet::obs {

namespace {

bool isLeap(int year) { return (year % 4 == 0 && year % 100 != 0) || year % 400 == 0; }

int daysInMonth(int year, int month) {
  static const int kDays[] = {31, 28, 31, 30, 31, 30, 31, 31, 30, 31, 30, 31};
  return month == 2 && isLeap(year) ? 29 : kDays[month - 1];
}

// Reads exactly n digits at text[*at].
bool digits(std::string_view text, std::size_t* at, int n, int* value) {
  if (*at + n > text.size()) return false;
  int v = 0;
  for (int i = 0; i < n; ++i) {
    const char c = text[*at + i];
    if (!std::isdigit(static_cast<unsigned char>(c))) return false;
    v = v * 10 + (c - '0');
  }
  *at += n;
  *value = v;
  return true;
}

std::string_view trimmed(std::string_view text) {
  while (!text.empty() && std::isspace(static_cast<unsigned char>(text.front()))) {
    text.remove_prefix(1);
  }
  while (!text.empty() && std::isspace(static_cast<unsigned char>(text.back()))) {
    text.remove_suffix(1);
  }
  return text;
}

}  // namespace

long long daysSince1950(int year, int month, int day) {
  // Count days from 0000-03-01 so that the leap day ends a year, then shift.
  auto fromMarchZero = [](long long y, long long m, long long d) {
    if (m <= 2) {
      y -= 1;
      m += 12;
    }
    const long long era = (y >= 0 ? y : y - 399) / 400;
    const long long yearOfEra = y - era * 400;
    const long long dayOfYear = (153 * (m - 3) + 2) / 5 + d - 1;
    const long long dayOfEra = yearOfEra * 365 + yearOfEra / 4 - yearOfEra / 100 + dayOfYear;
    return era * 146097 + dayOfEra;
  };
  return fromMarchZero(year, month, day) - fromMarchZero(1950, 1, 1);
}

bool parseIsoTime(std::string_view text, double* days, bool* dateOnly) {
  text = trimmed(text);
  std::size_t at = 0;
  int year = 0, month = 0, day = 0;
  if (!digits(text, &at, 4, &year) || at >= text.size() || text[at++] != '-' ||
      !digits(text, &at, 2, &month) || at >= text.size() || text[at++] != '-' ||
      !digits(text, &at, 2, &day)) {
    return false;
  }
  if (month < 1 || month > 12 || day < 1 || day > daysInMonth(year, month)) return false;
  double seconds = 0.0;
  const bool hasTime = at < text.size() && (text[at] == 'T' || text[at] == ' ');
  if (hasTime) {
    ++at;
    int hour = 0, minute = 0, second = 0;
    if (!digits(text, &at, 2, &hour) || at >= text.size() || text[at++] != ':' ||
        !digits(text, &at, 2, &minute)) {
      return false;
    }
    double fraction = 0.0;
    if (at < text.size() && text[at] == ':') {
      ++at;
      if (!digits(text, &at, 2, &second)) return false;
      if (at < text.size() && text[at] == '.') {
        ++at;
        double scale = 0.1;
        const std::size_t start = at;
        while (at < text.size() && std::isdigit(static_cast<unsigned char>(text[at]))) {
          fraction += (text[at] - '0') * scale;
          scale /= 10.0;
          ++at;
        }
        if (at == start) return false;
      }
    }
    if (hour > 23 || minute > 59 || second > 59) return false;
    seconds = hour * 3600.0 + minute * 60.0 + second + fraction;
  }
  std::string_view zone = text.substr(at);
  if (hasTime && !zone.empty() && (zone[0] == '+' || zone[0] == '-')) {
    // A UTC offset, +HH:MM or +HHMM: local time minus the offset is UTC.
    std::size_t z = 1;
    int hours = 0, minutes = 0;
    if (!digits(zone, &z, 2, &hours)) return false;
    if (z < zone.size() && zone[z] == ':') ++z;
    if (!digits(zone, &z, 2, &minutes) || z != zone.size() || hours > 23 || minutes > 59) {
      return false;
    }
    seconds -= (zone[0] == '+' ? 1 : -1) * (hours * 3600.0 + minutes * 60.0);
    zone = {};
  }
  if (!(zone.empty() || zone == "Z" || (hasTime && (zone == " UTC" || zone == "UTC")))) {
    return false;
  }
  *days = static_cast<double>(daysSince1950(year, month, day)) + seconds / 86400.0;
  if (dateOnly != nullptr) *dateOnly = !hasTime;
  return true;
}

bool parseDaysSinceUnit(std::string_view unit, double* referenceDays) {
  unit = trimmed(unit);
  std::string lower;
  for (char c : unit.substr(0, 11)) lower += static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  if (lower != "days since ") return false;
  std::string_view rest = trimmed(unit.substr(11));
  // "1950-01-01 00:00:00 UTC": the zone name may be set off by a blank.
  if (rest.size() > 4 && rest.substr(rest.size() - 4) == " UTC") rest.remove_suffix(4);
  return parseIsoTime(rest, referenceDays);
}

}  // namespace karnet::obs
