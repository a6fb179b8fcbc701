// Grid records and file descriptions: shapes, index rules, copies, fills and release.
#include "support/float_grid.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <vector>

#include "support/file_description.h"

namespace karnet {
namespace {

TEST(FileDescriptionTest, NewDescriptionsHoldDeleteValuesAndEmptyTexts) {
  descriptionFree(nullptr);
  FileDescription* d = descriptionNew(3);
  ASSERT_NE(d, nullptr);
  EXPECT_EQ(d->dimension, 3);
  ASSERT_EQ(d->itemCount, 16);  // numbered from 1: 17 slots
  std::vector<double> values(d->misc, d->misc + 7);
  values.insert(values.end(), d->header, d->header + 3);
  values.insert(values.end(), {d->deleteValue, d->startDate, d->timeAxis.start,
                               d->timeAxis.step, d->timeAxis.startTime});
  int zeros = d->timeAxis.firstStep | d->text1024[0];  // counts and first characters of texts
  for (const AxisDescription& axis : d->axes) {
    values.insert(values.end(), {axis.start, axis.factor, axis.spacing, axis.origin});
    zeros |= axis.lastIndex | axis.unit[0];
  }
  for (int slot = 0; slot <= 16; ++slot) {
    const ItemDescription& item = d->items[slot];
    values.insert(values.end(), item.values, item.values + 8);
    zeros |= item.name[0] | item.integers[0] | item.integers[1];
  }
  EXPECT_EQ(std::vector<float>(values.begin(), values.end()),
            std::vector<float>(values.size(), -1e-30f));
  EXPECT_EQ(zeros, 0);
  descriptionFree(d);
}

TEST(FloatGrid2DTest, ShapeComesFromTheDescriptionsXAndYAxes) {
  FileDescription* description = descriptionNew(2);
  description->axes[1].start = 3.7f;  // starts are truncated toward zero
  description->axes[1].lastIndex = 119;
  description->axes[2].start = -2.5f;
  description->axes[2].lastIndex = 79;
  const FloatGrid2D grid = grid2DFromDescription(*description);
  EXPECT_EQ(std::vector<std::int32_t>({grid.j0, grid.k0, grid.nj, grid.nk}),
            std::vector<std::int32_t>({3, -2, 120, 80}));
  EXPECT_EQ(grid.data, nullptr);
  descriptionFree(description);
}

TEST(FloatGrid2DTest, CopyWindowCopiesTheOverlapIntoTheDestination) {
  // The source covers (0, 0) to (5, 4); its elements, row by row, hold 100 j + k.
  FloatGrid2D source{0, 0, 6, 5};
  grid2DAlloc(source);
  for (int i = 0; i < 30; ++i) source.data[i] = static_cast<float>(100 * (i % 6) + i / 6);
  const FloatGrid2D cases[] = {{2, 1, 3, 2}, {4, -1, 4, 3}, {-3, 3, 10, 1}, {7, 0, 2, 2}};
  for (FloatGrid2D destination : cases) {
    SCOPED_TRACE(::testing::Message() << destination.j0 << "," << destination.k0);
    grid2DAlloc(destination);
    std::fill(destination.data, destination.data + destination.elementCount(), -7.0f);
    grid2DCopyWindow(destination, source);
    for (std::int32_t k = destination.k0; k < destination.k0 + destination.nk; ++k) {
      for (std::int32_t j = destination.j0; j < destination.j0 + destination.nj; ++j) {
        const bool inside = j >= 0 && j < 6 && k >= 0 && k < 5;
        EXPECT_EQ(destination.at(j, k), inside ? 100.0f * j + k : -7.0f) << j << "," << k;
      }
    }
    grid2DFree(destination);
  }
  grid2DFree(source);
  EXPECT_EQ(source.data, nullptr);
  grid2DFree(source);  // a second release finds nothing to do
}

FloatGrid3D makeGrid3D(std::int32_t nj, std::int32_t nk, std::int32_t nl) {
  FloatGrid3D grid{.j0 = 1, .k0 = 2, .l0 = -3, .nj = nj, .nk = nk, .nl = nl,
                   .total = std::int64_t{nj} * nk * nl};
  grid3DAlloc(grid);
  return grid;
}

TEST(FloatGrid3DTest, FillSetsEveryElementAndLeavesTheGuardWord) {
  FloatGrid3D grid = makeGrid3D(4, 3, 2);
  grid3DFill(grid, 2.5f);
  EXPECT_EQ(std::vector<float>(grid.data, grid.data + 24), std::vector<float>(24, 2.5f));
  EXPECT_EQ(std::memcmp(grid.data + 24, "9876", 4), 0);
  grid3DFree(grid);
  EXPECT_EQ(grid.data, nullptr);
}

TEST(FloatGrid3DTest, LargeGridsAreSizedAndIndexedIn64Bits) {
  // 1024 x 1024 x 513 floats take just over 2^31 bytes, beyond a 32-bit byte count.
  FloatGrid3D grid = makeGrid3D(1024, 1024, 513);
  ASSERT_EQ(grid.total, 537919488);
  grid.data[0] = 1.0f;
  grid.data[grid.total - 1] = 2.0f;
  EXPECT_EQ(std::memcmp(grid.data + grid.total, "9876", 4), 0);
  EXPECT_EQ(grid.at(1, 2, -3), 1.0f);
  EXPECT_EQ(grid.at(1024, 1025, 509), 2.0f);
  // x runs fastest and z slowest: ((l - l0) nk + (k - k0)) nj + (j - j0).
  grid.at(2, 4, -2) = 3.0f;
  EXPECT_EQ(grid.data[(1 * 1024 + 2) * 1024 + 1], 3.0f);
  grid3DFree(grid);
}

}  // namespace
}  // namespace karnet
