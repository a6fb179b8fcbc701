// From a source raster to a bathymetry file of karnet's layout.
#include "mkgrid/grid_builder.h"

#include <cfloat>
#include <cmath>
#include <new>

#include "gridfile/grid_file.h"
#include "mkgrid/resample.h"
#include "mkgrid/source_raster.h"
#include "mkgrid/target_grid.h"

namespace karnet::mkgrid {
namespace {

constexpr float kDelete = -1e-30f;
constexpr float kMiscThird = -900.0f;
constexpr int kMetre = 1000;
constexpr std::int32_t kItemType = 1;

bool representable(double value) { return std::isfinite(value) && std::fabs(value) <= FLT_MAX; }

}  // namespace

bool makeBathymetry(const MkgridOptions& options, Bathymetry* result, std::string* summary,
                    std::string* error) {
  if (!representable(options.landValue)) {
    *error = "the land value must be a finite 32-bit number";
    return false;
  }
  SourceRaster source;
  if (!openSourceRaster(options.input, options.variable, &source, error)) return false;
  TargetGrid grid;
  std::string notes;
  if (!planGrid(source, options, &grid, &notes, error)) return false;
  std::vector<double> raw;
  if (!resampleSource(source, grid, &raw, error)) return false;

  Bathymetry out;
  out.nx = grid.nx;
  out.ny = grid.ny;
  out.dx = static_cast<float>(grid.dx);
  out.dy = static_cast<float>(grid.dy);
  out.projection = grid.projection;
  out.longitude = grid.longitude;
  out.latitude = grid.latitude;
  out.orientation = grid.orientation;
  out.landValue = static_cast<float>(options.landValue);
  out.title = options.title;
  try {
    out.values.resize(raw.size());
  } catch (const std::bad_alloc&) {
    *error = "not enough memory for the bathymetry";
    return false;
  }
  const bool scaled = source.scale != 1.0 || source.offset != 0.0;
  std::size_t land = 0;
  for (std::size_t k = 0; k < raw.size(); ++k) {
    double v = raw[k];
    if (std::isnan(v)) {
      out.values[k] = out.landValue;
      ++land;
      continue;
    }
    if (scaled) v = v * source.scale + source.offset;
    if (options.negate) v = -v;
    if (!representable(v)) {
      *error = options.input + ": value " + std::to_string(v) + " does not fit a 32-bit float";
      return false;
    }
    out.values[k] = static_cast<float>(v);
  }
  if (land == raw.size()) {
    *error = "no node of the grid gets a value from " + options.input +
             ": the region does not overlap it, or all its cells there are NODATA";
    return false;
  }
  const char* methods[] = {"", "bilinear", "average", "nearest", "cubic"};
  *summary =
      "  source: " + options.input + ", " + source.what + "\n" + notes + "  " +
      (grid.copyCells ? std::string("nodes copied from the source's cells")
                      : std::string("resampled (") + methods[static_cast<int>(grid.method)] + ")") +
      "; " + std::to_string(land) + " of " + std::to_string(raw.size()) +
      " nodes without a value set to the land value\n";
  *result = std::move(out);
  return true;
}

bool writeBathymetry(const std::string& fileName, const Bathymetry& b, std::string* error) {
  std::string ignored;
  if (error == nullptr) error = &ignored;
  if (b.nx < 1 || b.ny < 1 ||
      b.values.size() != static_cast<std::size_t>(b.nx) * static_cast<std::size_t>(b.ny)) {
    *error = "the bathymetry holds no values or not nx x ny of them";
    return false;
  }
  grdInitSystem();
  GrdHeader* header = nullptr;
  if (grdHeaderCreate(1, fileName.c_str(), b.title.c_str(), 1, 1, 2, &header) != 0) {
    *error = "cannot describe the file";
    return false;
  }
  GrdItem* item = grdItemD(header, 1);
  const float misc[7] = {static_cast<float>(b.orientation),
                         kDelete,
                         kMiscThird,
                         b.landValue,
                         kDelete,
                         kDelete,
                         kDelete};
  const bool described =
      grdSetDeleteValFloat(header, kDelete) == 0 && grdSetDataType(header, 0) == 0 &&
      grdSetItemInfo(header, item, kItemType, "bathymetry", kMetre, 1) == 0 &&
      grdSetItemAxisEqD2(item, kMetre, b.nx, b.ny, 0.0f, 0.0f, b.dx, b.dy) == 0 &&
      grdAddCustomBlock(header, 1, "Q84_Misc", 7, misc) == 0 &&
      grdSetGeoInfoUTMProj(header, b.projection.c_str(), b.longitude, b.latitude, b.orientation) ==
          0;
  if (!described) {
    *error = "cannot describe the file (grid size, spacing or origin out of range)";
    grdHeaderDestroy(&header);
    return false;
  }
  GrdFile* file = nullptr;
  if (grdFileCreate(fileName.c_str(), header, &file) != 0) {
    *error = "cannot create " + fileName;
    grdHeaderDestroy(&header);
    return false;
  }
  if (grdWriteItemTimeStep(header, file, 0.0, b.values.data()) != 0) {
    *error = "cannot write the values";
    grdFileAbandon(header, &file);
    grdHeaderDestroy(&header);
    return false;
  }
  const bool closed = grdFileClose(header, &file) == 0;
  grdHeaderDestroy(&header);
  if (!closed) *error = "cannot write " + fileName;
  return closed;
}

}  // namespace karnet::mkgrid
