// The end-of-run summary: what was written, how much of the water got a
// value, and where the observations lay.
#include "control/run_summary.h"

#include "params/run_settings.h"
#include "support/file_description.h"
#include "support/float_grid.h"

namespace karnet {

void countResultLevel(const FloatGrid2D& bed, double landValue, const RunSettings& s,
                      std::int32_t l, const float* layer, RunSummary* summary) {
  const std::int64_t columns = std::int64_t{bed.nj} * bed.nk;
  const bool top = l == s.lx;
  const float height = static_cast<float>(l - s.lx - 1) * s.dz;
  std::int64_t wet = 0, estimated = 0;
  for (std::int64_t c = 0; c < columns; ++c) {
    const float b = bed.data[c];
    if (!(landValue > static_cast<double>(b)) || !(top || height > b)) continue;
    ++wet;
    if (layer[c] != kDeleteValueFloat) ++estimated;
  }
  summary->wetNodes += wet;
  summary->estimatedNodes += estimated;
}

void countResultNodes(const FloatGrid2D& bed, double landValue, const RunSettings& s,
                      const FloatGrid3D& values, RunSummary* summary, int threads) {
  summary->nx = values.nj;
  summary->ny = values.nk;
  summary->nz = values.nl;
  summary->wetNodes = 0;
  summary->estimatedNodes = 0;
  if (bed.nj != values.nj || bed.nk != values.nk || values.data == nullptr) return;
  const std::int64_t columns = std::int64_t{bed.nj} * bed.nk;
  // Layer by layer, local level l0 + n being layer n; whole counts, so the
  // order of the layers does not matter.
  std::int64_t wet = 0, estimated = 0;
#pragma omp parallel for schedule(dynamic, 1) num_threads(threads) if (threads > 1) \
    reduction(+ : wet, estimated)
  for (std::int32_t n = 0; n < values.nl; ++n) {
    RunSummary level;
    countResultLevel(bed, landValue, s, s.l0 + n, values.data + n * columns, &level);
    wet += level.wetNodes;
    estimated += level.estimatedNodes;
  }
  summary->wetNodes = wet;
  summary->estimatedNodes = estimated;
}

void printRunSummary(std::FILE* stream, const RunSummary& r, bool quiet) {
  const ObservationTally& o = r.observations;
  if (!quiet) {
    std::fprintf(stream, "karnet: result: %s\n", r.resultPath.c_str());
    std::fprintf(stream, "karnet: grid: %d x %d x %d nodes, %lld of %lld wet nodes estimated\n",
                 r.nx, r.ny, r.nz, static_cast<long long>(r.estimatedNodes),
                 static_cast<long long>(r.wetNodes));
    std::fprintf(stream,
                 "karnet: observations: %lld read, %lld used (in the water inside the grid), "
                 "%lld outside the grid, %lld on land, %lld below the bed\n",
                 static_cast<long long>(o.read), static_cast<long long>(o.inside),
                 static_cast<long long>(o.outside), static_cast<long long>(o.onLand),
                 static_cast<long long>(o.belowBed));
  }
  const std::int64_t inGrid = o.read - o.outside;
  if (o.read > 0 && static_cast<double>(inGrid) < kInsideShareWarning * static_cast<double>(o.read)) {
    std::fprintf(stream,
                 "karnet: warning: only %lld of %lld observations lie inside the grid: "
                 "check the projection\n",
                 static_cast<long long>(inGrid), static_cast<long long>(o.read));
  }
  std::fflush(stream);
}

}  // namespace karnet
