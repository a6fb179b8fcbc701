#include "obs/converter.h"

#include <charconv>
#include <cmath>
#include <cstdio>

#include "obs/z_from_p.h"

namespace karnet::obs {

namespace {

bool isLocal(const std::string& projection) {
  std::string text;
  for (char c : projection) {
    if (c != ' ' && c != '\t') text += static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
  }
  return text == "LOCAL";
}

std::string number(double v) {
  char text[64];
  const auto end = std::to_chars(text, text + sizeof text, v + 0.0).ptr;  // + 0.0: no "-0"
  return std::string(text, end);
}

bool insideBox(const std::array<double, 4>& box, double lon, double lat, bool geographic) {
  if (lat < box[1] || lat > box[3]) return false;
  if (!geographic) return lon >= box[0] && lon <= box[2];
  double width = box[2] - box[0];
  if (width < 0.0) width += 360.0;
  double offset = std::fmod(lon - box[0], 360.0);
  if (offset < 0.0) offset += 360.0;
  return offset <= width;
}

}  // namespace

std::string formatLine(double x, double y, double z, double value) {
  return number(x) + ' ' + number(y) + ' ' + number(z) + ' ' + number(value) + '\n';
}

Converter::Converter(const std::string& projection, const Filters& filters)
    : map_(projection, 0.0, 0.0, 0.0), filters_(filters), local_(isLocal(projection)) {}

void Converter::add(const Row& row, const Where& where) {
  if (row.skip != Skip::None) {
    ++counts_.of(row.skip);
    return;
  }
  auto fault = [&where](const std::string& what) { throw ObsError(where() + ": " + what); };
  if (!local_) {
    if (std::fabs(row.lat) > 90.0) fault("latitude " + number(row.lat) + " is beyond ±90");
    if (std::fabs(row.lon) > 360.0) fault("longitude " + number(row.lon) + " is beyond ±360");
  }
  if (row.isPressure) {
    if (local_) fault("pressure needs a latitude; with the LOCAL projection give depths");
    if (row.vertical < -10.0 || row.vertical > 12000.0) {
      fault("pressure " + number(row.vertical) + " dbar is outside -10 to 12000");
    }
  } else if (row.vertical < -10.0 || row.vertical > 12000.0) {
    fault("depth " + number(row.vertical) +
          " m is outside -10 to 12000 (depths count downwards from the surface)");
  }

  if (filters_.from || filters_.to) {
    if (!row.time) {
      ++counts_.of(Skip::Missing);
      return;
    }
    const double t = *row.time;
    const bool early = filters_.from && t < *filters_.from;
    const bool late = filters_.to && (filters_.toExclusive ? t >= *filters_.to : t > *filters_.to);
    if (early || late) {
      ++counts_.of(Skip::OutsideTime);
      return;
    }
  }
  if (filters_.box && !insideBox(*filters_.box, row.lon, row.lat, !local_)) {
    ++counts_.of(Skip::OutsideBox);
    return;
  }

  double x = 0.0, y = 0.0;
  map_.geoToProj(row.lon, row.lat, &x, &y);
  if (!std::isfinite(x) || !std::isfinite(y)) {
    fault("position " + number(row.lon) + ", " + number(row.lat) +
          " cannot be projected with this projection");
  }
  const double z = row.isPressure ? zFromPressure(row.vertical, row.lat) : -row.vertical;
  text_ += formatLine(x, y, z, row.value);
  ++counts_.kept;
}

std::string describeCounts(const Counts& counts) {
  char text[512];
  std::snprintf(text, sizeof text,
                "kept %lld of %lld rows; skipped: %lld bad QC flag, %lld fill value or NaN, "
                "%lld outside the time window, %lld outside the box, %lld unparsable",
                static_cast<long long>(counts.kept), static_cast<long long>(counts.total()),
                static_cast<long long>(counts.of(Skip::BadQc)),
                static_cast<long long>(counts.of(Skip::Missing)),
                static_cast<long long>(counts.of(Skip::OutsideTime)),
                static_cast<long long>(counts.of(Skip::OutsideBox)),
                static_cast<long long>(counts.of(Skip::Unparsable)));
  return text;
}

}  // namespace karnet::obs
