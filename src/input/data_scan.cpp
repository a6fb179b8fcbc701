#include "input/data_scan.h"

#include <cctype>
#include <cerrno>
#include <cmath>
#include <cstdio>
#include <algorithm>
#include <cstdlib>
#include <limits>
#include <string>
#include <utility>

#include "control/log.h"
#include "control/progress.h"
#include "control/ranks.h"
#include "input/bathymetry_read.h"
#include "input/cartography.h"
#include "input/level_share.h"
#include "input/observation_line.h"
#include "params/run_settings.h"
#include "state/run_context.h"
#include "state/run_state.h"
#include "support/file_check.h"
#include "support/file_description.h"
#include "support/memory_limit.h"
#include "support/run_error.h"

namespace karnet {
namespace {

constexpr std::int64_t kMaxCount = 2147483647;

// Data scanning gives back everything allocated so far before the run stops.
[[noreturn]] void stopScan(RunState& state, const std::string& message,
                          const std::string& notice = std::string()) {
  releaseAll(state);
  throw RunError::logged(message).withNotice(notice);
}

// The grid frame: projected coordinates turned by the grid rotation.
struct Rotation {
  double co = 1, si = 0;
  void turn(double x, double y, double* xt, double* yt) const {
    *xt = x * co + y * si;
    *yt = y * co - x * si;
  }
};

struct Extent {
  double min, max;
  void add(double v) {
    if (v < min) min = v;
    if (v > max) max = v;
  }
};

// Extents of the bathymetry nodes in the grid frame.
void bathymetryExtents(const FileDescription& d, const Cartography& map, const Rotation& r,
                       Extent& x, Extent& y) {
  double x0 = 0, y0 = 0;
  map.geoToProj(d.axes[1].origin, d.axes[2].origin, &x0, &y0);
  const AxisDescription& ax = d.axes[1];
  const AxisDescription& ay = d.axes[2];
  const std::int32_t iFirst = static_cast<std::int32_t>(ax.start);
  const std::int32_t jFirst = static_cast<std::int32_t>(ay.start);
  for (std::int32_t j = jFirst; j <= jFirst + ay.lastIndex; ++j) {
    const double yp = y0 + static_cast<double>(static_cast<float>(j) * ay.spacing * ay.factor);
    for (std::int32_t i = iFirst; i <= iFirst + ax.lastIndex; ++i) {
      const double xp =
          x0 + static_cast<double>(static_cast<float>(i) * ax.spacing * ax.factor);
      double xt, yt;
      r.turn(xp, yp, &xt, &yt);
      x.add(xt);
      y.add(yt);
    }
  }
}

// The log keeps its fixed lines; the user also sees the file, the line and why.
[[noreturn]] void waterFileError(RunState& state, const char* fileName, std::int64_t lineNumber,
                                 const std::string& reason) {
  releaseAll(state);
  throw RunError::logged("\nERROR while reading water file\n      line number: " +
                         std::to_string(lineNumber) + "\n")
      .withNotice(fileNotice(std::string(fileName) + ":" + std::to_string(lineNumber), reason));
}

// Blocks in which the observation file is read and parsed.
constexpr std::size_t kObservationBlock = std::size_t{16} << 20;

// Reads every observation line, turned into the grid frame, the lines of each
// block parsed on the run's threads. Returns the count.
std::int64_t readObservations(RunState& state, const char* fileName, const Rotation& r,
                              int threads, Extent ext[3]) {
  ScatterData& sd = state.scatter;
  std::FILE* file = state.observationFile;
  std::rewind(file);
  // The arrays were sized from the line count; a file that grew since then
  // must not write past them.
  const ObservationLinesRead read = readObservationLines(
      file, sd.capacity, threads, kObservationBlock,
      [&sd, &r](std::int64_t i, const double* v) {
        const double x = v[0], y = v[1];
        sd.x[i] = y * r.si + x * r.co;
        sd.y[i] = y * r.co - x * r.si;
        sd.z[i] = v[2];
        sd.value[i] = v[3];
      },
      [] { progressCheckCancel(); });
  const std::int64_t lineNumber = read.lines + 1;
  switch (read.stop) {
    case ObservationLinesRead::Stop::kNulByte:
      waterFileError(state, fileName, lineNumber, "holds a NUL byte");
    case ObservationLinesRead::Stop::kUnreadable: {
      const std::string problem = observationLineProblem(read.stopLine.c_str());
      waterFileError(state, fileName, lineNumber, problem.empty() ? "cannot be read" : problem);
    }
    case ObservationLinesRead::Stop::kBeyondLimit:
      waterFileError(state, fileName, lineNumber, "the file grew while it was read");
    case ObservationLinesRead::Stop::kEnd:
      break;
  }
  // Extents in file order (the first of equal values stands, as one pass
  // over the lines would have it).
  for (std::int64_t i = 0; i < read.lines; ++i) {
    ext[0].add(sd.x[i]);
    ext[1].add(sd.y[i]);
    ext[2].add(sd.z[i]);
  }
  std::fclose(file);
  state.observationFile = nullptr;
  return read.lines;
}

// Counts where an observation lies: its column (the basic node it bins to,
// as the gridding does) in the local grid's footprint, that column's bed.
void tallyObservation(const FloatGrid2D& bed, double landValue, std::int32_t jOff,
                      std::int32_t kOff, double xBasic, double yBasic, double z,
                      ObservationTally& tally) {
  const std::int64_t i = static_cast<std::int64_t>(xBasic + 0.5) - jOff;
  const std::int64_t j = static_cast<std::int64_t>(yBasic + 0.5) - kOff;
  if (i < 0 || j < 0 || i >= bed.nj || j >= bed.nk) {
    ++tally.outside;
    return;
  }
  const float b = bed.data[j * bed.nj + i];
  if (!(landValue > static_cast<double>(b))) {
    ++tally.onLand;
  } else if (z < static_cast<double>(b)) {
    ++tally.belowBed;
  } else {
    ++tally.inside;
  }
}

}  // namespace

std::string observationLineProblem(const char* line) {
  const char* p = line;
  for (int n = 0; n < 4; ++n) {
    while (*p == ' ' || *p == '\t' || *p == '\r' || *p == '\v' || *p == '\f') ++p;
    if (*p == '\0') {
      if (n == 0) return "empty line";
      return "4 numbers expected (x y z value), found " + std::to_string(n);
    }
    const char* wordEnd = p;
    while (*wordEnd != '\0' && std::isspace(static_cast<unsigned char>(*wordEnd)) == 0) ++wordEnd;
    std::string word(p, std::min<std::size_t>(static_cast<std::size_t>(wordEnd - p), 40));
    char* end = nullptr;
    const double v = std::strtod(p, &end);
    if (end == p) return "not a number: \"" + word + "\"";
    if (!std::isfinite(v)) return "not a finite number: \"" + word + "\"";
    p = end;
  }
  return std::string();
}

BasicAxis layBasicAxis(double dataMin, double dataMax, double localFirst, float spacing,
                       std::int32_t firstIndex, std::int32_t lastIndex) {
  const double d = static_cast<double>(spacing);
  BasicAxis a;
  if (dataMin < localFirst) {
    const double steps = std::trunc((localFirst - dataMin) / d) + 1;
    if (!(steps <= static_cast<double>(kMaxCount))) {
      a.count = std::numeric_limits<std::int64_t>::max();
      return a;
    }
    const auto n = static_cast<std::int32_t>(steps);
    a.origin = localFirst - static_cast<double>(static_cast<float>(n) * spacing);
  } else {
    a.origin = localFirst;
    a.originWarning = dataMin > localFirst;
  }
  a.offset = static_cast<std::int64_t>(std::trunc((localFirst - a.origin) / d + 0.5));
  const double spanNodes = std::trunc((dataMax - a.origin) / d) + 1;
  const double localNodes =
      static_cast<double>(lastIndex) + 1 + static_cast<double>(a.offset - firstIndex);
  const double m = spanNodes > localNodes ? spanNodes : localNodes;
  if (!(m <= static_cast<double>(kMaxCount))) {
    a.count = std::numeric_limits<std::int64_t>::max();
    return a;
  }
  const float mSpan = static_cast<float>(static_cast<std::int32_t>(m)) * spacing;
  a.count = static_cast<std::int64_t>(
                std::trunc((static_cast<double>(mSpan) + a.origin - a.origin) / d + 0.5)) +
            1;
  return a;
}

void dataScan(RunState& state, const RunContext& context, const char* bathymetryFile,
              std::int32_t* lastObs, std::int32_t* jOff, std::int32_t* kOff,
              std::int32_t* lOff, ObservationTally* tally) {
  const RunSettings& s = context.settings;
  Report& report = context.report;
  if (context.cartography == nullptr) stopScan(state, "\nUnable to initialize geo. system\n");
  const Cartography& map = *context.cartography;
  double longitude = 0, latitude = 0;
  map.projToGeo(s.xOrigo, s.yOrigo, &longitude, &latitude);
  const double gamma = map.convergence(longitude, latitude);
  const double theta = (s.orientation - gamma) * (-3.141592654) / 180;
  Rotation r;
  r.co = std::cos(theta);
  r.si = std::sin(theta);
  double xg0, yg0;
  r.turn(s.xOrigo, s.yOrigo, &xg0, &yg0);
  const double zg0 = static_cast<double>(static_cast<float>(s.l0 - s.lx - 1) * s.dz);

  // The bathymetry as run setup read it; read here when that read failed.
  FileDescription* bathymetry = std::exchange(state.bathymetryDescription, nullptr);
  if (bathymetry == nullptr) {
    progressStatus("Reading bathymetry file ...");
    bathymetry = descriptionNew(2);
    if (bathymetry == nullptr) stopScan(state, "\nUnable to allocate memory \n");
    std::string problem;
    if (bathymetryRead(bathymetryFile, *bathymetry, 1, state.bathymetryGrid, &problem) == 0) {
      descriptionFree(bathymetry);
      stopScan(state, "\nERROR while reading bathymetry file\n",
               fileNotice(bathymetryFile, problem));
    }
  }
  const double bedMin = static_cast<double>(bathymetry->items[1].values[1]);
  constexpr double kInf = std::numeric_limits<double>::infinity();
  Extent bx{kInf, -kInf}, by{kInf, -kInf};
  bathymetryExtents(*bathymetry, map, r, bx, by);
  descriptionFree(bathymetry);

  progressStatus("Reading data file ...");
  Extent obs[3] = {{1e9, -1e9}, {1e9, -1e9}, {1e9, -1e9}};
  const std::int64_t count = readObservations(state, s.dataFileName, r, context.threads, obs);

  const double xMin = std::min(obs[0].min, bx.min), xMax = std::max(obs[0].max, bx.max);
  const double yMin = std::min(obs[1].min, by.min), yMax = std::max(obs[1].max, by.max);
  const double zMin = std::min(obs[2].min, bedMin), zMax = std::max(obs[2].max, 0.0);

  const BasicAxis ax = layBasicAxis(xMin, xMax, xg0, s.dx, s.j0, s.jx);
  if (ax.originWarning) report.write("\nWARNING : X-origo outside of digitized data\n");
  const BasicAxis ay = layBasicAxis(yMin, yMax, yg0, s.dy, s.k0, s.kx);
  if (ay.originWarning) report.write("\nWARNING : Y-origo outside of digitized data\n");
  const BasicAxis az = layBasicAxis(zMin, zMax, zg0, s.dz, s.l0, s.lx);
  if (az.originWarning) report.write("\nWARNING : Z-origo outside of digitized data\n");

  if (xg0 + static_cast<double>(static_cast<float>(s.jx - s.j0) * s.dx) > xMax) {
    report.write("\nWARNING: X-upper bound outside of digitized data\n");
  }
  if (yg0 + static_cast<double>(static_cast<float>(s.kx - s.k0) * s.dy) > yMax) {
    report.write("\nWARNING: Y-upper bound outside of digitized data\n");
  }
  if (static_cast<double>(static_cast<float>(s.lx - s.l0) * s.dz) > zMax) {
    report.write("\nWARNING: Z-upper bound outside of digitized data\n");
  }

  // Far-off observations can ask for a basic grid beyond what the grid records
  // (32-bit counts) and memory can hold.
  const bool tooLarge = ax.count > kMaxCount || ay.count > kMaxCount || az.count > kMaxCount ||
                        ax.count < 1 || ay.count < 1 || az.count < 1 ||
                        ax.count * ay.count > kMaxCount ||
                        ax.count * ay.count * az.count > kMaxCount;
  if (tooLarge) stopScan(state, "\nERROR: basic grid too large\n");
  // Each process holds the levels it works on; alone, it holds them all.
  const LevelRange share = shareBasicLevels(
      state, s, static_cast<std::int32_t>(az.count), static_cast<std::int32_t>(ax.offset),
      static_cast<std::int32_t>(ay.offset), static_cast<std::int32_t>(az.offset), rankCount(),
      rankIndex());
  // The four basic-grid fields (of the levels held) come on top of what is
  // already held; a request that cannot be met stops here, before anything is
  // allocated.
  const std::uint64_t layer = byteSize(static_cast<std::uint64_t>(ax.count * ay.count), 4);
  const std::uint64_t volume = byteSize(layer, static_cast<std::uint64_t>(share.count));
  const std::uint64_t localBytes =
      state.localValues.data != nullptr ? static_cast<std::uint64_t>(state.localValues.total) : 0;
  const std::uint64_t held = byteSize(localBytes, 4) +
                             byteSize(static_cast<std::uint64_t>(state.scatter.capacity), 32);
  const std::uint64_t needed = 2 * volume + 2 * layer + held;
  const std::uint64_t limit = memoryLimitBytes();
  if (needed > limit) {
    char line[256];
    std::snprintf(line, sizeof line,
                  "\nBasic grid of %lld x %lld x %lld nodes needs %llu bytes with the result grid"
                  " and the observations; at most %llu bytes of memory are available\n",
                  static_cast<long long>(ax.count), static_cast<long long>(ay.count),
                  static_cast<long long>(az.count), static_cast<unsigned long long>(needed),
                  static_cast<unsigned long long>(limit));
    stopScan(state, std::string(line) + "\nUnable to allocate memory \n");
  }

  *lastObs = static_cast<std::int32_t>(count - 1);
  *jOff = static_cast<std::int32_t>(ax.offset);
  *kOff = static_cast<std::int32_t>(ay.offset);
  *lOff = static_cast<std::int32_t>(az.offset);

  ScatterData& sd = state.scatter;
  const double dx = s.dx, dy = s.dy, dz = s.dz;
  ObservationTally counted;
  counted.read = count;
  for (std::int64_t n = 0; n < count; ++n) {
    const double z = sd.z[n];
    sd.x[n] = (sd.x[n] - ax.origin) / dx;
    sd.y[n] = (sd.y[n] - ay.origin) / dy;
    sd.z[n] = (z - az.origin) / dz;
    if (tally != nullptr) {
      tallyObservation(state.bathymetryGrid, state.landValue, *jOff, *kOff, sd.x[n], sd.y[n], z,
                       counted);
    }
  }
  if (tally != nullptr) *tally = counted;

  const auto nj = static_cast<std::int32_t>(ax.count);
  const auto nk = static_cast<std::int32_t>(ay.count);
  const auto nl = static_cast<std::int32_t>(az.count);
  for (FloatGrid3D* g : {&state.basicBathymetry, &state.basicValues}) {
    *g = FloatGrid3D{};
    g->nj = nj;
    g->nk = nk;
    g->l0 = share.first;
    g->nl = share.count;
    g->total = std::int64_t{nj} * nk * share.count;
    if (g->total > 0) grid3DAlloc(*g);
  }

  report.write("\nBasic grid parameters:\n");
  report.write("\n");
  report.printf("Number of x-nodes: %4d\n", nj);
  report.printf("Number of y-nodes: %4d\n", nk);
  report.printf("Number of z-nodes: %4d\n", nl);
}

}  // namespace karnet
