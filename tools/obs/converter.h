#ifndef KARNET_TOOLS_OBS_CONVERTER_H_
#define KARNET_TOOLS_OBS_CONVERTER_H_

#include <array>
#include <optional>
#include <string>

#include "input/cartography.h"
#include "obs/observation.h"

namespace karnet::obs {

struct Filters {
  std::optional<double> from;         // days since 1950-01-01, kept from here on (inclusive)
  std::optional<double> to;           // kept up to here
  bool toExclusive = false;           // "to" is the start of the day after a date-only --to
  std::optional<std::array<double, 4>> box;  // lon0, lat0, lon1, lat1 (lon1 < lon0: across 180)
};

// Filters rows, projects them and turns pressure into height, collecting the lines
// "x y z value" of karnet's observation file. Every number is written as the shortest text that
// reads back as the same double, so karnet sees exactly the computed values.
class Converter {
 public:
  // projection: a projection text of karnet (LOCAL, UTM-32, EPSG:..., PROJ string, WKT).
  Converter(const std::string& projection, const Filters& filters);

  // Takes one row. Throws ObsError, naming where, for a position or depth that cannot be
  // right (latitude beyond ±90°, pressure or depth below -10 or beyond 12000, a point the
  // projection cannot take).
  void add(const Row& row, const Where& where);

  const std::string& text() const { return text_; }
  const Counts& counts() const { return counts_; }
  bool local() const { return local_; }

 private:
  Cartography map_;
  Filters filters_;
  bool local_ = false;
  std::string text_;
  Counts counts_;
};

// The summary for the standard error stream: rows kept and rows left out by reason.
std::string describeCounts(const Counts& counts);

// "x y z value\n" with each number in its shortest round-trip form.
std::string formatLine(double x, double y, double z, double value);

}  // namespace karnet::obs

#endif  // KARNET_TOOLS_OBS_CONVERTER_H_
