#include "input/bathymetry_read.h"

#include <cstring>
#include <string>

#include "gridfile/grid_file.h"

namespace karnet {
namespace {

constexpr const char* kMiscBlockName = "Q84_Misc";

// Walks the custom blocks; the first whose name matches "Q84_Misc" over the
// name's own length (at most eight characters) fills misc.
void readMiscBlock(GrdHeader* header, FileDescription& description) {
  GrdCustomBlock* block = nullptr;
  if (grdGetCustomBlockRef(header, &block) != 0) return;
  while (block != nullptr) {
    std::int32_t type = 0;
    const char* name = nullptr;
    std::int32_t count = 0;
    const float* values = nullptr;
    GrdCustomBlock* next = nullptr;
    if (grdGetCustomBlock(block, &type, &name, &count, &values, &next) != 0) return;
    std::size_t n = name != nullptr ? std::strlen(name) : 0;
    if (n > 8) n = 8;
    if (name != nullptr && std::strncmp(name, kMiscBlockName, n) == 0) {
      // A shorter block leaves its missing values at the delete value.
      for (int i = 0; i < 7 && i < count; ++i) description.misc[i] = static_cast<double>(values[i]);
      return;
    }
    block = next;
  }
}

void setAxis(AxisDescription& axis, std::int32_t count, float spacing) {
  axis.spacing = spacing;
  axis.factor = 1.0f;
  axis.start = 0.0f;
  // The node count is kept as an integer: passing it through a float would
  // round counts beyond 2^24 and point past the data.
  axis.lastIndex = count - 1;
}

}  // namespace

int bathymetryRead(const char* fileName, FileDescription& description, int wantValues,
                   FloatGrid2D& grid, std::string* reason) {
  std::string ignored;
  if (reason == nullptr) reason = &ignored;
  grdInitSystem();
  GrdHeader* header = nullptr;
  GrdFile* file = nullptr;
  if (grdFileRead(fileName, &header, &file, reason) != 0) {
    grdHeaderDestroy(&header);
    return 0;
  }
  auto fail = [&header, reason](const char* why) {
    *reason = why;
    grdHeaderDestroy(&header);
    return 0;
  };
  grdGetNoOfItems(header);
  GrdItem* item = grdItemD(header, 1);
  if (item == nullptr) return fail("no 2-D item (no data variable)");
  if (grdSetItemUnitConversion(item, 3, 0) != 0) return fail("its item's values are unusable");
  if (grdGetItemAxisType(item) != 5) {
    return fail(
        "no usable 2-D item (numeric heights on evenly spaced x and y nodes of positive "
        "spacing)");
  }

  std::int32_t jStart = 0, kStart = 0, nx = 0, ny = 0;
  double xOrigin = 0, yOrigin = 0;
  float dx = 0, dy = 0;
  grdGetItemAxisEqD2(item, &jStart, &kStart, &nx, &ny, &xOrigin, &yOrigin, &dx, &dy);
  if (nx < 1 || ny < 1) return fail("its grid has no nodes");
  setAxis(description.axes[1], nx, dx);
  setAxis(description.axes[2], ny, dy);

  std::string projection;
  double longitude = 0, latitude = 0, orientation = 0;
  if (grdGetGeoInfoUTMProj(header, &projection, &longitude, &latitude, &orientation) != 0) {
    return fail(
        "no crs variable with projection, origin_longitude, origin_latitude and orientation");
  }
  description.axes[1].origin = longitude;
  description.axes[2].origin = latitude;

  readMiscBlock(header, description);

  double minimum = 0, maximum = 0;
  if (wantValues != 0) {
    grid2DFree(grid);
    grid = grid2DFromDescription(description);
    grid2DAlloc(grid);
    double time = 0;
    if (grdReadItemStatsAndFirstStep(header, file, &minimum, &maximum, &time, grid.data) != 0) {
      return fail("its item's values cannot be read");
    }
  } else if (grdGetItemStatsGlobal(item, &minimum, &maximum, nullptr) != 0) {
    return fail("its item's values cannot be read");
  }
  description.items[1].values[1] = static_cast<float>(minimum);
  description.items[1].values[2] = static_cast<float>(maximum);
  grdHeaderDestroy(&header);
  return 1;
}

}  // namespace karnet
