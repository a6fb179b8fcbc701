#include "input/run_initialise.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <string>

#include "control/log.h"
#include "control/progress.h"
#include "control/ranks.h"
#include "input/cartography.h"
#include "params/run_settings.h"
#include "state/run_context.h"
#include "state/run_state.h"
#include "support/date_time.h"
#include "support/file_check.h"
#include "support/file_description.h"
#include "support/memory_limit.h"
#include "support/run_error.h"

namespace karnet {
namespace {

constexpr std::int64_t kMaxElements = 2147483647;

// The failures of run initialisation reach the log only, as "\nERROR: %s\n".
[[noreturn]] void initialisationError(const char* message) {
  throw RunError::logged(std::string("\nERROR: ") + message + "\n");
}

// Number of lines: every line feed ends one, and a last line without a line
// feed counts too. Asks for a cancel at every thousandth line feed.
std::int64_t countLines(std::FILE* file) {
  std::int64_t lineFeeds = 0;
  int last = '\n';
  char buffer[1 << 16];
  std::size_t n;
  while ((n = std::fread(buffer, 1, sizeof buffer, file)) > 0) {
    for (std::size_t i = 0; i < n; ++i) {
      if (buffer[i] == '\n') {
        ++lineFeeds;
        if (lineFeeds % 1000 == 0) progressCheckCancel();
      }
    }
    last = static_cast<unsigned char>(buffer[n - 1]);
  }
  return lineFeeds + (last != '\n' ? 1 : 0);
}

void setAxis(AxisDescription& axis, std::int32_t start, float spacing, std::int32_t lastIndex,
             double origin) {
  axis.start = static_cast<float>(start);
  axis.factor = 1.0f;
  axis.spacing = spacing;
  axis.lastIndex = lastIndex;
  axis.origin = origin;
  std::snprintf(axis.unit, sizeof axis.unit, "meter");
}

void fillResultHeader(FileDescription& d, const RunSettings& s) {
  d.misc[0] = s.orientation;
  d.misc[2] = -900.0;
  d.misc[3] = s.landValue;
  d.dimension = 3.0;
  d.header[0] = 1.0;
  d.header[1] = 3.0;
  d.header[2] = 0.0;
  d.startDate = static_cast<double>(s.startDateTime.dayNumber);
  d.deleteValue = static_cast<double>(kDeleteValueFloat);
  d.timeAxis.start = 0.0;
  d.timeAxis.firstStep = 0;
  d.timeAxis.step = 1.0;
  d.timeAxis.further = 0.0;
  d.timeAxis.startTime = static_cast<float>(secondsOfDay(s.startDateTime));
  std::snprintf(d.timeAxis.unit, sizeof d.timeAxis.unit, "sec");
}

// Ends the run before allocating when the result grid and the observation
// arrays together need more memory than the process can ever get.
void requireMemory(std::int64_t nj, std::int64_t nk, std::int64_t nl, std::int64_t observations) {
  const std::uint64_t grid = byteSize(static_cast<std::uint64_t>(nj * nk * nl), sizeof(float));
  const std::uint64_t scatter =
      byteSize(static_cast<std::uint64_t>(observations), 4 * sizeof(double));
  const std::uint64_t needed = grid > UINT64_MAX - scatter ? UINT64_MAX : grid + scatter;
  const std::uint64_t limit = memoryLimitBytes();
  if (needed <= limit) return;
  char line[256];
  std::snprintf(line, sizeof line,
                "\nResult grid of %lld x %lld x %lld nodes and %lld observations need %llu bytes;"
                " at most %llu bytes of memory are available\n",
                static_cast<long long>(nj), static_cast<long long>(nk), static_cast<long long>(nl),
                static_cast<long long>(observations), static_cast<unsigned long long>(needed),
                static_cast<unsigned long long>(limit));
  throw RunError::logged(std::string(line) + "\nERROR: Unable to allocate memory\n");
}

}  // namespace

void runInitialise(RunState& state, const RunContext& context) {
  const RunSettings& s = context.settings;
  // Spans that do not fit the grid records' 32-bit counts cannot be allocated.
  const std::int64_t nj = std::int64_t{s.jx} - s.j0 + 1;
  const std::int64_t nk = std::int64_t{s.kx} - s.k0 + 1;
  const std::int64_t nl = std::int64_t{s.lx} - s.l0 + 1;
  if (nj > kMaxElements || nk > kMaxElements || nl > kMaxElements ||
      nj * nk > kMaxElements || nj * nk * nl > kMaxElements) {
    initialisationError("Unable to allocate memory");
  }
  progressStartGrid(s.jx - s.j0, s.kx - s.k0, s.lx - s.l0);
  progressStatus("Initializing ...");

  state.observationFile = std::fopen(s.dataFileName, "rb");
  if (state.observationFile == nullptr) {
    throw RunError::logged("\nERROR: unable to open ASCII data file\n")
        .withNotice(fileNotice(s.dataFileName, std::strerror(errno)));
  }
  const std::int64_t count = countLines(state.observationFile);
  if (count <= kMaxElements) requireMemory(nj, nk, nl, count);
  if (count > kMaxElements || !scatterDataAlloc(state.scatter, count)) initialisationError("Unable to allocate memory");

  state.resultDescription = descriptionNew(3);
  if (state.resultDescription == nullptr) initialisationError("Unable to allocate memory");
  FileDescription& d = *state.resultDescription;
  fillResultHeader(d, s);

  if (context.cartography == nullptr) initialisationError("Unable to initialize geo. system");
  double longitude = 0, latitude = 0;
  context.cartography->projToGeo(s.xOrigo, s.yOrigo, &longitude, &latitude);

  setAxis(d.axes[1], s.j0, s.dx, s.jx - s.j0, longitude);
  setAxis(d.axes[2], s.k0, s.dy, s.kx - s.k0, latitude);
  setAxis(d.axes[3], s.l0, s.dz, s.lx - s.l0,
          static_cast<double>(static_cast<float>(-s.lx) * s.dz));

  FloatGrid3D& local = state.localValues;
  local.j0 = s.j0;
  local.k0 = s.k0;
  local.l0 = s.l0;
  local.nj = static_cast<std::int32_t>(nj);
  local.nk = static_cast<std::int32_t>(nk);
  local.nl = static_cast<std::int32_t>(nl);
  local.unitJ = local.unitK = local.unitL = 1;
  local.total = nj * nk * nl;
  // Over several processes no process holds the whole result: its levels go
  // from the process that holds them to the result file.
  if (rankCount() == 1) grid3DAlloc(local);
}

}  // namespace karnet
