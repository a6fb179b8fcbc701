// Tables of observations as users keep them: a header line of column names, then one row per
// measurement.
#include "obs/table_reader.h"

#include <algorithm>
#include <cctype>
#include <charconv>
#include <cmath>
#include <optional>
#include <string_view>

#include "obs/iso_time.h"

namespace karnet::obs {

namespace {

std::string trim(std::string_view text) {
  const char* blanks = " \t\r\n\f\v";
  const std::size_t first = text.find_first_not_of(blanks);
  if (first == std::string_view::npos) return std::string();
  const std::size_t last = text.find_last_not_of(blanks);
  return std::string(text.substr(first, last - first + 1));
}

std::string lower(std::string_view text) {
  std::string out(text);
  for (char& c : out) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return out;
}

// A column name as it is compared: lower case, without a unit in brackets at its end
// ("Pressure (dbar)", "depth [m]").
std::string comparable(const std::string& name) {
  std::string text = trim(name);
  if (!text.empty() && (text.back() == ')' || text.back() == ']')) {
    const char open = text.back() == ')' ? '(' : '[';
    const std::size_t at = text.rfind(open);
    if (at != std::string::npos && at > 0) text = trim(text.substr(0, at));
  }
  return lower(text);
}

std::string listColumns(const std::vector<std::string>& header) {
  std::string out;
  for (const std::string& name : header) out += (out.empty() ? "" : ", ") + name;
  return out;
}

struct Columns {
  int lon = -1, lat = -1, vertical = -1, value = -1, time = -1, qc = -1;
  bool isPressure = false;
  std::vector<int> valueCandidates;  // when no column is named for the values
};

class ColumnFinder {
 public:
  ColumnFinder(const std::vector<std::string>& header, const std::string& name)
      : header_(header), name_(name) {
    for (const std::string& column : header) names_.push_back(comparable(column));
  }

  // The column named by an option (required), else the first of the default names that the
  // header has; -1 when none.
  int find(const std::string& given, std::initializer_list<const char*> defaults,
           const char* what) const {
    if (!given.empty()) {
      const int at = indexOf(comparable(given));
      if (at < 0) {
        throw ObsError(name_ + ": no column '" + given + "' for the " + what + " (columns: " +
                       listColumns(header_) + ")");
      }
      return at;
    }
    for (const char* candidate : defaults) {
      const int at = indexOf(candidate);
      if (at >= 0) return at;
    }
    return -1;
  }

  std::string nameOf(int column) const { return header_[column]; }
  int size() const { return static_cast<int>(header_.size()); }
  const std::string& comparableName(int column) const { return names_[column]; }

 private:
  int indexOf(const std::string& wanted) const {
    int found = -1;
    for (int i = 0; i < static_cast<int>(names_.size()); ++i) {
      if (names_[i] != wanted) continue;
      if (found >= 0) {
        throw ObsError(name_ + ": two columns are named '" + header_[i] + "'");
      }
      found = i;
    }
    return found;
  }

  const std::vector<std::string>& header_;
  const std::string& name_;
  std::vector<std::string> names_;
};

Columns findColumns(const std::vector<std::string>& header, const std::string& name,
                    const ReadOptions& options) {
  const ColumnFinder finder(header, name);
  Columns c;
  c.lon = finder.find(options.lonColumn, {"lon", "longitude"}, "longitude");
  c.lat = finder.find(options.latColumn, {"lat", "latitude"}, "latitude");
  if (c.lon < 0 || c.lat < 0) {
    throw ObsError(name + ": no " + std::string(c.lon < 0 ? "longitude" : "latitude") +
                   " column (name it with --lon / --lat; columns: " + listColumns(header) + ")");
  }
  if (!options.pressureColumn.empty()) {
    c.vertical = finder.find(options.pressureColumn, {}, "pressure");
    c.isPressure = true;
  } else {
    c.vertical = finder.find(options.depthColumn, {"depth"}, "depth");
    if (c.vertical < 0) {
      c.vertical = finder.find("", {"pres", "pressure"}, "pressure");
      c.isPressure = true;
    }
  }
  if (c.vertical < 0) {
    throw ObsError(name + ": no depth or pressure column (name it with --depth or --pressure; "
                   "columns: " + listColumns(header) + ")");
  }
  c.time = finder.find(options.timeColumn, {"time", "date", "datetime"}, "time");
  if (options.needTime && c.time < 0) {
    throw ObsError(name + ": no time column for --from / --to (name it with --time; columns: " +
                   listColumns(header) + ")");
  }
  if (!options.qcColumn.empty()) c.qc = finder.find(options.qcColumn, {}, "quality flags");
  c.value = finder.find(options.valueColumn, {"value"}, "value");
  if (c.value < 0) {
    // The one column that is none of the others nor another vertical coordinate.
    std::vector<int> others;
    for (int i = 0; i < finder.size(); ++i) {
      const std::string& n = finder.comparableName(i);
      if (i == c.lon || i == c.lat || i == c.vertical || i == c.time || i == c.qc ||
          n == "depth" || n == "pres" || n == "pressure" || n.empty()) {
        continue;
      }
      others.push_back(i);
    }
    if (others.size() == 1) {
      c.value = others[0];
    } else {
      c.valueCandidates = others;  // decided by the first row: the one numeric column
    }
  }
  return c;
}

[[noreturn]] void whichValueColumn(const std::vector<std::string>& header, const std::string& name) {
  throw ObsError(name + ": which column holds the values? Name it with --value (columns: " +
                 listColumns(header) + ")");
}

enum class Parsed { Number, Missing, Bad };

bool isMissingText(const std::string& text) {
  if (text.empty()) return true;
  const std::string l = lower(text);
  return l == "nan" || l == "-nan" || l == "na" || l == "n/a" || l == "null" || l == "none" ||
         l == "-";
}

Parsed parseNumber(const std::string& field, char delimiter, const ReadOptions& options,
                   double* value) {
  if (isMissingText(field)) return Parsed::Missing;
  std::string text = field;
  // Semicolon tables often come from locales that write a decimal comma.
  if (delimiter == ';' && text.find('.') == std::string::npos &&
      std::count(text.begin(), text.end(), ',') == 1) {
    std::replace(text.begin(), text.end(), ',', '.');
  }
  const char* begin = text.data();
  const char* end = text.data() + text.size();
  if (begin != end && *begin == '+') ++begin;
  const auto [stop, error] = std::from_chars(begin, end, *value);
  if (error != std::errc() || stop != end) return Parsed::Bad;
  if (std::isnan(*value)) return Parsed::Missing;
  if (!std::isfinite(*value)) return Parsed::Bad;
  for (double fill : options.fillValues) {
    if (*value == fill) return Parsed::Missing;
  }
  return Parsed::Number;
}

}  // namespace

std::vector<std::string> splitFields(const std::string& line, char delimiter) {
  std::vector<std::string> fields;
  std::string field;
  bool quoted = false;
  bool any = false;  // something (even an empty quoted text) in the current field
  auto finish = [&] {
    fields.push_back(trim(field));
    field.clear();
    any = false;
  };
  for (std::size_t i = 0; i < line.size(); ++i) {
    const char c = line[i];
    if (quoted) {
      if (c == '"' && i + 1 < line.size() && line[i + 1] == '"') {
        field += '"';
        ++i;
      } else if (c == '"') {
        quoted = false;
      } else {
        field += c;
      }
    } else if (c == '"') {
      quoted = true;
      any = true;
    } else if (delimiter == ' ' ? (c == ' ' || c == '\t') : c == delimiter) {
      if (delimiter == ' ' && field.empty() && !any) continue;  // runs of blanks are one
      finish();
    } else {
      field += c;
      if (c != ' ' && c != '\t') any = true;
    }
  }
  if (delimiter != ' ' || !field.empty() || any) finish();
  return fields;
}

char detectDelimiter(const std::string& header) {
  int tabs = 0, semicolons = 0, commas = 0;
  bool quoted = false;
  for (char c : header) {
    if (c == '"') quoted = !quoted;
    if (quoted) continue;
    tabs += c == '\t';
    semicolons += c == ';';
    commas += c == ',';
  }
  if (tabs == 0 && semicolons == 0 && commas == 0) return ' ';
  if (tabs >= semicolons && tabs >= commas) return '\t';
  if (semicolons >= commas) return ';';
  return ',';
}

void readTable(std::istream& in, const std::string& name, const ReadOptions& options,
               const RowSink& sink) {
  std::string line;
  long long lineNumber = 0;
  std::vector<std::string> header;
  char delimiter = ',';
  Columns columns;
  int needed = 0;  // fields a row must have
  while (std::getline(in, line)) {
    ++lineNumber;
    if (lineNumber == 1 && line.compare(0, 3, "\xEF\xBB\xBF") == 0) line.erase(0, 3);
    if (!line.empty() && line.back() == '\r') line.pop_back();
    const std::string content = trim(line);
    if (content.empty() || content[0] == '#') continue;
    if (header.empty()) {
      for (char c : line) {
        if ((static_cast<unsigned char>(c) < 0x20 && c != '\t' && c != '\r') || c == '\x7f') {
          throw ObsError(name + ":" + std::to_string(lineNumber) +
                         ": not a text table (control characters) nor a NetCDF file");
        }
      }
      delimiter = detectDelimiter(line);
      header = splitFields(line, delimiter);
      columns = findColumns(header, name, options);
      if (columns.value < 0 && columns.valueCandidates.empty()) whichValueColumn(header, name);
      needed = 1 + std::max({columns.lon, columns.lat, columns.vertical, columns.value,
                             options.needTime ? columns.time : -1, columns.qc});
      continue;
    }
    const std::vector<std::string> fields = splitFields(line, delimiter);
    if (columns.value < 0) {
      // Several columns could hold the values: the only one with a number in the first row
      // (a station name or cruise id has none).
      std::vector<int> numeric;
      for (int column : columns.valueCandidates) {
        double v = 0.0;
        if (column < static_cast<int>(fields.size()) &&
            parseNumber(fields[column], delimiter, options, &v) != Parsed::Bad) {
          numeric.push_back(column);
        }
      }
      if (numeric.size() != 1) whichValueColumn(header, name);
      columns.value = numeric[0];
      needed = std::max(needed, columns.value + 1);
    }
    const Where where = [&name, lineNumber] { return name + ":" + std::to_string(lineNumber); };
    Row row;
    row.isPressure = columns.isPressure;
    if (static_cast<int>(fields.size()) < needed) {
      if (!options.skipBadText) {
        throw ObsError(where() + ": " + std::to_string(fields.size()) + " fields, " +
                       std::to_string(needed) + " needed for the columns in use");
      }
      row.skip = Skip::Unparsable;
      sink(row, where);
      continue;
    }
    bool bad = false, missing = false;
    auto number = [&](int column, double* target) {
      switch (parseNumber(fields[column], delimiter, options, target)) {
        case Parsed::Number:
          return;
        case Parsed::Missing:
          missing = true;
          return;
        case Parsed::Bad:
          if (!options.skipBadText) {
            throw ObsError(where() + ": not a number in column '" + header[column] + "': \"" +
                           fields[column] + "\"");
          }
          bad = true;
      }
    };
    number(columns.lon, &row.lon);
    number(columns.lat, &row.lat);
    number(columns.vertical, &row.vertical);
    number(columns.value, &row.value);
    if (options.needTime) {
      const std::string& text = fields[columns.time];
      double days = 0.0;
      if (isMissingText(text)) {
        missing = true;
      } else if (parseIsoTime(text, &days)) {
        row.time = days;
      } else if (!options.skipBadText) {
        throw ObsError(where() + ": not an ISO date or time in column '" + header[columns.time] +
                       "': \"" + text + "\"");
      } else {
        bad = true;
      }
    }
    if (bad) {
      row.skip = Skip::Unparsable;
    } else if (missing) {
      row.skip = Skip::Missing;
    } else if (columns.qc >= 0) {
      const std::string& flag = fields[columns.qc];
      const char f = flag.empty() ? '0' : flag[0];
      if (flag.size() > 1 || options.goodFlags.count(f) == 0) row.skip = Skip::BadQc;
    }
    sink(row, where);
  }
  if (in.bad()) throw ObsError(name + ": read error");
  if (header.empty()) throw ObsError(name + ": no header line of column names");
}

}  // namespace karnet::obs
