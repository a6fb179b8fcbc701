// From an ESRI ASCII grid to a bathymetry file of karnet's layout.
#include "mkgrid/grid_builder.h"

#include <cfloat>
#include <cmath>
#include <exception>

#include "gridfile/grid_file.h"
#include "input/cartography.h"

namespace karnet::mkgrid {
namespace {

constexpr float kDelete = -1e-30f;
constexpr float kMiscThird = -900.0f;
constexpr int kMetre = 1000;
constexpr std::int32_t kItemType = 1;

bool representable(double value) { return std::isfinite(value) && std::fabs(value) <= FLT_MAX; }

}  // namespace

bool buildBathymetry(const EsriGrid& grid, const BuildOptions& options, Bathymetry* result,
                     std::string* error) {
  std::string ignored;
  if (error == nullptr) error = &ignored;
  if (grid.ncols < 1 || grid.nrows < 1 ||
      grid.values.size() != static_cast<std::size_t>(grid.ncols) * grid.nrows) {
    *error = "the grid holds no values";
    return false;
  }
  if (!(grid.dx > 0.0) || !(grid.dy > 0.0) || !representable(grid.dx) ||
      !representable(grid.dy)) {
    *error = "cell sizes must be positive";
    return false;
  }
  if (!representable(options.landValue)) {
    *error = "the land value must be a finite 32-bit number";
    return false;
  }
  Bathymetry out;
  out.nx = grid.ncols;
  out.ny = grid.nrows;
  out.dx = static_cast<float>(grid.dx);
  out.dy = static_cast<float>(grid.dy);
  out.projection = options.projection;
  out.landValue = static_cast<float>(options.landValue);
  out.title = options.title;

  try {
    Cartography map(options.projection, 0.0, 0.0, 0.0);
    if (options.origin == OriginSource::Geographic) {
      out.longitude = options.originA;
      out.latitude = options.originB;
    } else {
      double x = options.originA;
      double y = options.originB;
      if (options.origin == OriginSource::Grid) {
        // The origin node is the centre of the south-west cell.
        x = grid.xll + (grid.xIsCorner ? grid.dx / 2.0 : 0.0);
        y = grid.yll + (grid.yIsCorner ? grid.dy / 2.0 : 0.0);
      }
      map.projToGeo(x, y, &out.longitude, &out.latitude);
    }
    if (!std::isfinite(out.longitude) || !std::isfinite(out.latitude)) {
      *error = "the origin lies outside the projection's domain";
      return false;
    }
    out.orientation = options.hasOrientation ? options.orientation
                                             : map.convergence(out.longitude, out.latitude);
  } catch (const std::exception& e) {
    *error = "unusable projection '" + options.projection + "': " + e.what();
    return false;
  }
  if (!std::isfinite(out.orientation)) {
    *error = "the orientation is not a finite number";
    return false;
  }

  const std::size_t nx = static_cast<std::size_t>(grid.ncols);
  const std::size_t ny = static_cast<std::size_t>(grid.nrows);
  out.values.resize(nx * ny);
  for (std::size_t row = 0; row < ny; ++row) {
    const std::size_t j = ny - 1 - row;  // the file's first row is the northernmost
    for (std::size_t i = 0; i < nx; ++i) {
      const double v = grid.values[row * nx + i];
      double stored = grid.isNodata(v) ? options.landValue : (options.negate ? -v : v);
      if (!representable(stored)) {
        *error = "value " + std::to_string(v) + " does not fit a 32-bit float";
        return false;
      }
      out.values[j * nx + i] = static_cast<float>(stored);
    }
  }
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
  const float misc[7] = {static_cast<float>(b.orientation), kDelete, kMiscThird, b.landValue,
                         kDelete, kDelete, kDelete};
  const bool described =
      grdSetDeleteValFloat(header, kDelete) == 0 && grdSetDataType(header, 0) == 0 &&
      grdSetItemInfo(header, item, kItemType, "bathymetry", kMetre, 1) == 0 &&
      grdSetItemAxisEqD2(item, kMetre, b.nx, b.ny, 0.0f, 0.0f, b.dx, b.dy) == 0 &&
      grdAddCustomBlock(header, 1, "Q84_Misc", 7, misc) == 0 &&
      grdSetGeoInfoUTMProj(header, b.projection.c_str(), b.longitude, b.latitude,
                           b.orientation) == 0;
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
