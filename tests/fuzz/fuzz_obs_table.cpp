// karnet-obs's table reader (CSV, TSV, semicolon or blank separated) on
// arbitrary bytes. The first byte picks the options a user may give (skip
// bad text, a time window, a flag column); the rest is the table. Every row
// handed on is named by the table and its line, and a row that is not
// marked as left out carries finite numbers.
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <sstream>
#include <string>

#include "obs/table_reader.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using namespace karnet::obs;
  if (size == 0) return 0;
  ReadOptions options;
  const std::uint8_t pick = data[0];
  options.skipBadText = (pick & 1) != 0;
  options.needTime = (pick & 2) != 0;
  if ((pick & 4) != 0) options.qcColumn = "qc";
  if ((pick & 8) != 0) options.valueColumn = "temp";
  if ((pick & 16) != 0) options.pressureColumn = "pres";
  std::istringstream in(std::string(reinterpret_cast<const char*>(data) + 1, size - 1));
  const std::string name = "table.csv";
  long long previousLine = 0;
  try {
    readTable(in, name, options, [&](const Row& row, const Where& where) {
      const std::string at = where();
      if (at.compare(0, name.size() + 1, name + ":") != 0) std::abort();
      const long long line = std::stoll(at.substr(name.size() + 1));
      if (line <= previousLine) std::abort();  // rows come in file order, once each
      previousLine = line;
      if (row.skip == Skip::None) {
        if (!std::isfinite(row.lon) || !std::isfinite(row.lat) || !std::isfinite(row.vertical) ||
            !std::isfinite(row.value)) {
          std::abort();
        }
        if (options.needTime && (!row.time || !std::isfinite(*row.time))) std::abort();
      }
    });
  } catch (const ObsError& e) {
    // A refusal names the table.
    if (std::string(e.what()).compare(0, name.size(), name) != 0) std::abort();
  }
  return 0;
}
