// karnet-mkgrid's strict ESRI ASCII reader on arbitrary bytes. A grid it
// accepts is complete and sound: a positive cell size, exactly ncols x nrows
// finite values, each within float range unless it is the NODATA value.
#include <cfloat>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <sstream>
#include <string>

#include "mkgrid/esri_ascii.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using namespace karnet::mkgrid;
  std::istringstream in(std::string(reinterpret_cast<const char*>(data), size));
  EsriGrid grid;
  std::string error;
  if (!parseEsriAscii(in, &grid, &error)) {
    // A refusal always says why.
    if (error.empty()) std::abort();
    return 0;
  }
  if (grid.ncols < 1 || grid.nrows < 1) std::abort();
  if (static_cast<std::int64_t>(grid.values.size()) != std::int64_t{grid.ncols} * grid.nrows) {
    std::abort();
  }
  if (!(grid.dx > 0.0) || !(grid.dy > 0.0) || !std::isfinite(grid.dx) || !std::isfinite(grid.dy) ||
      !std::isfinite(grid.xll) || !std::isfinite(grid.yll)) {
    std::abort();
  }
  for (double v : grid.values) {
    if (!std::isfinite(v) || (std::fabs(v) > FLT_MAX && !grid.isNodata(v))) std::abort();
  }
  return 0;
}
