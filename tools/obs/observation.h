#ifndef KARNET_TOOLS_OBS_OBSERVATION_H_
#define KARNET_TOOLS_OBS_OBSERVATION_H_

#include <array>
#include <cstdint>
#include <functional>
#include <optional>
#include <set>
#include <stdexcept>
#include <string>
#include <vector>

namespace karnet::obs {

// A fault in the input or the options; the message names the file and the line or variable.
class ObsError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

// Why a row was left out. The readers decide the first three, the converter the rest.
enum class Skip { None, BadQc, Missing, Unparsable, OutsideTime, OutsideBox, Count };

// One measurement as a reader found it, before filtering and projection.
struct Row {
  double lon = 0.0;       // degrees east (or x in metres for the LOCAL projection)
  double lat = 0.0;       // degrees north (or y in metres)
  double vertical = 0.0;  // pressure in dbar, or depth in metres (positive down)
  bool isPressure = false;
  double value = 0.0;
  std::optional<double> time;  // days since 1950-01-01 00:00 UTC, where known
  Skip skip = Skip::None;      // set by the reader for fill values, bad flags, bad text
};

// Where a row came from, for messages: "file.csv:12" or "argo.nc: profile 3, level 17".
using Where = std::function<std::string()>;

// Every reader hands its rows to one of these, in file order.
using RowSink = std::function<void(const Row&, const Where&)>;

// What the readers need to know.
struct ReadOptions {
  // Table columns: empty means the default names.
  std::string lonColumn, latColumn, depthColumn, pressureColumn, valueColumn, timeColumn;
  std::string qcColumn;           // optional flag column of a table
  bool needTime = false;          // a time window is given: the time must be read
  bool skipBadText = false;       // count text that is not a number as unparsable, not stop
  std::vector<double> fillValues{99999.0, 999999.0};  // table values that mean "missing"
  // Argo profiles.
  std::string variable = "TEMP";  // TEMP, PSAL, DOXY, ...
  bool raw = false;               // never take the *_ADJUSTED values
  std::set<char> goodFlags{'1', '2'};
};

// Counts for the summary on the standard error stream.
struct Counts {
  std::int64_t kept = 0;
  std::array<std::int64_t, static_cast<int>(Skip::Count)> skipped{};
  std::int64_t total() const {
    std::int64_t n = kept;
    for (std::int64_t s : skipped) n += s;
    return n;
  }
  std::int64_t& of(Skip s) { return skipped[static_cast<int>(s)]; }
  std::int64_t of(Skip s) const { return skipped[static_cast<int>(s)]; }
};

}  // namespace karnet::obs

#endif  // KARNET_TOOLS_OBS_OBSERVATION_H_
