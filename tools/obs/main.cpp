// karnet-obs: turns observation tables and Argo profile files into karnet's observation file,
// lines "x y z value" in the bathymetry's projection with z the height in metres.
#include <cerrno>
#include <charconv>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <memory>
#include <set>
#include <string>
#include <vector>

#include "common/tool_argument.h"
#include "obs/argo_reader.h"
#include "obs/converter.h"
#include "obs/files.h"
#include "obs/iso_time.h"
#include "obs/observation.h"
#include "obs/table_reader.h"

#ifndef KARNET_VERSION
#define KARNET_VERSION "unknown"
#endif

namespace {

using namespace karnet::obs;
using karnet::splitToolArgument;
using karnet::ToolArgument;
using karnet::toolOptionValue;

constexpr const char* kUsage =
    "Usage: karnet-obs (--bathymetry FILE | --projection TEXT) [options] INPUT... [-o OUTPUT]\n";

constexpr const char* kHelp =
    "Turns observation tables and Argo profile files into karnet's observation file: one line\n"
    "\"x y z value\" per measurement, x and y projected metres, z the height in metres (negative\n"
    "below the surface). Pressure becomes height by TEOS-10's z_from_p. Rows with fill values,\n"
    "NaN or rejected quality flags are left out; a summary goes to the standard error stream.\n"
    "\n"
    "Inputs: NetCDF Argo profile files (*_prof.nc, single-profile files), recognised by their\n"
    "content, and tables with a header line of column names, separated by commas, tabs,\n"
    "semicolons or blanks ('-' reads a table from the standard input).\n"
    "\n"
    "Projection (one of them is required):\n"
    "  -b, --bathymetry FILE  take the projection of this bathymetry file (its crs variable)\n"
    "  -p, --projection TEXT  LOCAL, UTM-<zone>[N|S], EPSG:<code>, a PROJ string or WKT\n"
    "                         (LOCAL: the lon and lat columns are x and y in metres already)\n"
    "Output:\n"
    "  -o, --output FILE      the observation file (default: the standard output); written\n"
    "                         under a temporary name and renamed when complete\n"
    "Tables (column names are matched ignoring case and a unit in brackets at the end):\n"
    "      --lon NAME         longitude column (default: lon, longitude)\n"
    "      --lat NAME         latitude column (default: lat, latitude)\n"
    "      --depth NAME       depth column, metres positive down (default: depth)\n"
    "      --pressure NAME    pressure column, dbar (default, without a depth column: pres,\n"
    "                         pressure)\n"
    "      --value NAME       value column (default: value, or the only other column)\n"
    "      --time NAME        time column, ISO dates and times, UTC unless an offset\n"
    "                         (+02:00) follows (default: time, date, datetime)\n"
    "      --qc-column NAME   quality flag column, checked like the Argo flags\n"
    "      --fill V           another value that means \"missing\" (besides empty, NaN, NA,\n"
    "                         99999 and 999999); may be repeated\n"
    "      --skip-bad         count rows with text that is not a number as unparsable and go on\n"
    "                         (default: stop with an error)\n"
    "Argo profiles:\n"
    "      --variable NAME    TEMP (default), PSAL, DOXY, ...\n"
    "      --raw              take the raw values, never the *_ADJUSTED ones\n"
    "Filters:\n"
    "      --qc LIST          quality flags kept, default 1,2 (blank flags count as 0)\n"
    "      --from TIME        keep observations from this ISO date or time (UTC) on\n"
    "      --to TIME          ... up to this time; a date alone means the end of that day\n"
    "      --box LON0,LAT0,LON1,LAT1\n"
    "                         keep observations inside this box (degrees; LON1 < LON0 crosses\n"
    "                         180 degrees)\n"
    "  -h, --help             this text\n"
    "      --version          the version\n";

int usageError(const std::string& message) {
  std::fprintf(stderr, "karnet-obs: %s\n%s", message.c_str(), kUsage);
  return 1;
}

bool parseDouble(const std::string& text, double* value) {
  const char* begin = text.data();
  const char* end = begin + text.size();
  if (begin != end && *begin == '+') ++begin;
  const auto [stop, error] = std::from_chars(begin, end, *value);
  return error == std::errc() && stop == end && begin != end && std::isfinite(*value);
}

bool parseFlags(const std::string& text, std::set<char>* flags) {
  flags->clear();
  std::size_t at = 0;
  while (at <= text.size()) {
    const std::size_t comma = std::min(text.find(',', at), text.size());
    const std::string item = text.substr(at, comma - at);
    if (item.size() != 1 || item[0] < '0' || item[0] > '9') return false;
    flags->insert(item[0]);
    at = comma + 1;
  }
  return !flags->empty();
}

bool parseBox(const std::string& text, std::array<double, 4>* box) {
  std::size_t at = 0;
  for (int i = 0; i < 4; ++i) {
    const std::size_t comma = i < 3 ? text.find(',', at) : text.size();
    if (comma == std::string::npos || !parseDouble(text.substr(at, comma - at), &(*box)[i])) {
      return false;
    }
    at = comma + 1;
  }
  return true;
}

}  // namespace

int main(int argc, char** argv) {
  ReadOptions read;
  Filters filters;
  std::string bathymetry, projection, output;
  std::vector<std::string> inputs;

  for (int i = 1; i < argc; ++i) {
    const ToolArgument argument = splitToolArgument(argv[i]);
    const std::string& arg = argument.name;
    const bool hasValue = argument.attached;
    auto needValue = [&](std::string* out) {
      return toolOptionValue(argument, argc, argv, i, out);
    };
    std::string text;
    auto takeText = [&](std::string* out) {
      if (!needValue(out) || out->empty()) throw std::invalid_argument(arg + " needs a value");
    };
    try {
      if (arg == "-h" || arg == "--help") {
        std::printf("%s%s", kUsage, kHelp);
        return 0;
      } else if (arg == "--version") {
        std::printf("karnet-obs %s\n", KARNET_VERSION);
        return 0;
      } else if (arg == "-b" || arg == "--bathymetry") {
        takeText(&bathymetry);
      } else if (arg == "-p" || arg == "--projection") {
        takeText(&projection);
      } else if (arg == "-o" || arg == "--output") {
        takeText(&output);
      } else if (arg == "--lon") {
        takeText(&read.lonColumn);
      } else if (arg == "--lat") {
        takeText(&read.latColumn);
      } else if (arg == "--depth") {
        takeText(&read.depthColumn);
      } else if (arg == "--pressure") {
        takeText(&read.pressureColumn);
      } else if (arg == "--value") {
        takeText(&read.valueColumn);
      } else if (arg == "--time") {
        takeText(&read.timeColumn);
      } else if (arg == "--qc-column") {
        takeText(&read.qcColumn);
      } else if (arg == "--variable") {
        takeText(&read.variable);
      } else if (arg == "--raw" && !hasValue) {
        read.raw = true;
      } else if (arg == "--skip-bad" && !hasValue) {
        read.skipBadText = true;
      } else if (arg == "--fill") {
        takeText(&text);
        double fill = 0.0;
        if (!parseDouble(text, &fill)) return usageError("bad fill value '" + text + "'");
        read.fillValues.push_back(fill);
      } else if (arg == "--qc") {
        takeText(&text);
        if (!parseFlags(text, &read.goodFlags)) {
          return usageError("--qc needs flags 0 to 9 separated by commas, not '" + text + "'");
        }
      } else if (arg == "--from" || arg == "--to") {
        takeText(&text);
        double days = 0.0;
        bool dateOnly = false;
        if (!parseIsoTime(text, &days, &dateOnly)) {
          return usageError(arg + " needs an ISO date or time (2007-05-31, 2007-05-31T12:00), "
                            "not '" + text + "'");
        }
        if (arg == "--from") {
          filters.from = days;
        } else {
          filters.to = dateOnly ? days + 1.0 : days;
          filters.toExclusive = dateOnly;
        }
      } else if (arg == "--box") {
        takeText(&text);
        std::array<double, 4> box{};
        if (!parseBox(text, &box)) {
          return usageError("--box needs four numbers LON0,LAT0,LON1,LAT1, not '" + text + "'");
        }
        filters.box = box;
      } else if (arg == "--" && !hasValue) {
        for (++i; i < argc; ++i) inputs.push_back(argv[i]);
      } else if (arg.size() > 1 && arg[0] == '-') {
        return usageError("unknown option '" + arg + "'");
      } else {
        inputs.push_back(arg);
      }
    } catch (const std::invalid_argument& e) {
      return usageError(e.what());
    }
  }

  if (inputs.empty()) return usageError("give at least one input file");
  if (bathymetry.empty() == projection.empty()) {
    return usageError("give either --bathymetry FILE or --projection TEXT");
  }
  if (!read.depthColumn.empty() && !read.pressureColumn.empty()) {
    return usageError("give either --depth or --pressure, not both");
  }
  if (filters.from && filters.to &&
      (filters.toExclusive ? *filters.to <= *filters.from : *filters.to < *filters.from)) {
    return usageError("--to lies before --from");
  }
  read.needTime = filters.from.has_value() || filters.to.has_value();
  if (!output.empty()) {
    // Renaming the result over an input would destroy it.
    std::error_code ignored;
    std::vector<std::string> sources = inputs;
    if (!bathymetry.empty()) sources.push_back(bathymetry);
    for (const std::string& source : sources) {
      if (source != "-" && std::filesystem::equivalent(source, output, ignored)) {
        return usageError("the output " + output + " is also an input");
      }
    }
  }

  try {
    if (!bathymetry.empty()) projection = bathymetryProjection(bathymetry);
    std::unique_ptr<Converter> converter;
    try {
      converter = std::make_unique<Converter>(projection, filters);
    } catch (const std::exception& e) {
      throw ObsError("projection '" + projection + "' not usable: " + e.what());
    }
    if (filters.box) {
      const auto& b = *filters.box;
      if (b[1] > b[3] || (!converter->local() && (std::fabs(b[1]) > 90.0 || std::fabs(b[3]) > 90.0))) {
        return usageError("--box latitudes must run from south to north within -90 to 90");
      }
      if (converter->local() && b[0] > b[2]) return usageError("--box needs x0 <= x1 with LOCAL");
    }
    const RowSink sink = [&converter](const Row& row, const Where& where) {
      converter->add(row, where);
    };
    const auto note = [](const std::string& text) {
      std::fprintf(stderr, "karnet-obs: note: %s\n", text.c_str());
    };
    for (const std::string& input : inputs) {
      if (input == "-") {
        readTable(std::cin, "(standard input)", read, sink);
        continue;
      }
      std::error_code ignored;
      if (std::filesystem::is_directory(input, ignored)) throw ObsError(input + ": is a directory");
      std::ifstream in(input, std::ios::binary);
      if (!in) throw ObsError(input + ": cannot open: " + std::strerror(errno));
      if (looksLikeNetcdf(input)) {
        in.close();
        readArgo(input, read, sink, note);
      } else {
        readTable(in, input, read, sink);
      }
    }
    const Counts& counts = converter->counts();
    std::fprintf(stderr, "karnet-obs: %s\n", describeCounts(counts).c_str());
    if (counts.kept == 0) throw ObsError("no observation left to write");
    if (output.empty()) {
      const std::string& text = converter->text();
      if (std::fwrite(text.data(), 1, text.size(), stdout) != text.size() ||
          std::fflush(stdout) != 0) {
        throw ObsError("cannot write to the standard output");
      }
    } else {
      writeFileAtomically(output, converter->text());
    }
  } catch (const ObsError& e) {
    std::fprintf(stderr, "karnet-obs: %s\n", e.what());
    return 1;
  } catch (const std::bad_alloc&) {
    std::fprintf(stderr, "karnet-obs: out of memory\n");
    return 1;
  } catch (const std::exception& e) {
    // Nothing throws anything else on purpose; should it happen, the program
    // still ends with a message and exit code 1 rather than an abort.
    std::fprintf(stderr, "karnet-obs: %s\n", e.what());
    return 1;
  }
  return 0;
}
