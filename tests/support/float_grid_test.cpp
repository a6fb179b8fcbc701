// Grid records and file descriptions: shapes, index rules, copies, fills and release.
#include "support/float_grid.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <vector>

#include "support/file_description.h"

namespace karnet {
namespace {

TEST(FileDescriptionTest, DimensionOutsideZeroToFourBecomesTheDeleteValue) {
  struct Case {
    std::int32_t dimension;
    double expected;
  };
  const Case cases[] = {{-1, -1e-30}, {0, 0.0}, {1, 1.0}, {3, 3.0}, {4, 4.0}, {5, -1e-30}};
  for (const Case& c : cases) {
    FileDescription* description = descriptionCreate(c.dimension, 2);
    ASSERT_NE(description, nullptr);
    EXPECT_EQ(description->dimension, c.expected) << c.dimension;
    descriptionFree(description);
  }
}

TEST(FileDescriptionTest, NewDescriptionHoldsDeleteValuesAndEmptyTexts) {
  FileDescription* description = descriptionNew(3);
  ASSERT_NE(description, nullptr);
  EXPECT_EQ(description->deleteValue, -1e-30);
  EXPECT_EQ(description->startDate, -1e-30);
  for (double value : description->misc) EXPECT_EQ(value, -1e-30);
  for (double value : description->header) EXPECT_EQ(value, -1e-30);
  for (const AxisDescription& axis : description->axes) {
    EXPECT_EQ(axis.start, -1e-30f);
    EXPECT_EQ(axis.factor, -1e-30f);
    EXPECT_EQ(axis.spacing, -1e-30f);
    EXPECT_EQ(axis.origin, -1e-30);
    EXPECT_EQ(axis.lastIndex, 0);
    EXPECT_EQ(axis.unit[0], '\0');
  }
  EXPECT_EQ(description->timeAxis.start, -1e-30);
  EXPECT_EQ(description->timeAxis.step, -1e-30);
  EXPECT_EQ(description->timeAxis.startTime, -1e-30f);
  EXPECT_EQ(description->timeAxis.firstStep, 0);
  EXPECT_EQ(description->text1024[0], '\0');

  // descriptionNew gives 16 items, numbered from 1: 17 slots.
  EXPECT_EQ(description->itemCount, 16);
  for (int slot = 0; slot <= 16; ++slot) {
    for (float value : description->items[slot].values) EXPECT_EQ(value, -1e-30f) << slot;
    EXPECT_EQ(description->items[slot].name[0], '\0') << slot;
    EXPECT_EQ(description->items[slot].integers[0], 0) << slot;
    EXPECT_EQ(description->items[slot].integers[1], 0) << slot;
  }
  descriptionFree(description);
}

TEST(FileDescriptionTest, NegativeItemCountGivesNoDescription) {
  EXPECT_EQ(descriptionCreate(2, -1), nullptr);
  descriptionFree(nullptr);  // releasing nothing is harmless
}

FileDescription* bathymetryDescription(float xStart, float yStart, int xLast, int yLast) {
  FileDescription* description = descriptionNew(2);
  description->axes[1].start = xStart;
  description->axes[1].lastIndex = xLast;
  description->axes[2].start = yStart;
  description->axes[2].lastIndex = yLast;
  return description;
}

TEST(FloatGrid2DTest, ShapeComesFromTheDescriptionsXAndYAxes) {
  FileDescription* description = bathymetryDescription(0.0f, 0.0f, 119, 79);
  FloatGrid2D grid = grid2DFromDescription(*description);
  EXPECT_EQ(grid.j0, 0);
  EXPECT_EQ(grid.k0, 0);
  EXPECT_EQ(grid.nj, 120);
  EXPECT_EQ(grid.nk, 80);
  EXPECT_EQ(grid.data, nullptr);
  descriptionFree(description);

  // Axis starts are truncated toward zero.
  description = bathymetryDescription(3.7f, -2.5f, 0, 4);
  grid = grid2DFromDescription(*description);
  EXPECT_EQ(grid.j0, 3);
  EXPECT_EQ(grid.k0, -2);
  EXPECT_EQ(grid.nj, 1);
  EXPECT_EQ(grid.nk, 5);
  descriptionFree(description);
}

// A source grid whose node (j, k) holds 100 j + k.
FloatGrid2D makeSource(std::int32_t j0, std::int32_t k0, std::int32_t nj, std::int32_t nk) {
  FloatGrid2D grid;
  grid.j0 = j0;
  grid.k0 = k0;
  grid.nj = nj;
  grid.nk = nk;
  grid2DAlloc(grid);
  for (std::int32_t k = k0; k < k0 + nk; ++k) {
    for (std::int32_t j = j0; j < j0 + nj; ++j) grid.at(j, k) = static_cast<float>(100 * j + k);
  }
  return grid;
}

TEST(FloatGrid2DTest, NodesAreStoredRowByRowFromTheOrigin) {
  FloatGrid2D grid = makeSource(-2, 5, 4, 3);
  // Node (j, k) is element (k - k0) * nj + (j - j0).
  EXPECT_EQ(grid.data[0], 100.0f * -2 + 5);
  EXPECT_EQ(grid.data[3], 100.0f * 1 + 5);
  EXPECT_EQ(grid.data[4], 100.0f * -2 + 6);
  EXPECT_EQ(grid.data[11], 100.0f * 1 + 7);
  grid2DFree(grid);
  EXPECT_EQ(grid.data, nullptr);
  grid2DFree(grid);  // a second release finds nothing to do
}

TEST(FloatGrid2DTest, CopyWindowCopiesExactlyTheDestinationsWindow) {
  FloatGrid2D source = makeSource(0, 0, 6, 5);
  const std::vector<float> before(source.data, source.data + 30);

  FloatGrid2D window;
  window.j0 = 2;
  window.k0 = 1;
  window.nj = 3;
  window.nk = 2;
  grid2DAlloc(window);
  grid2DCopyWindow(window, source);
  for (std::int32_t k = 1; k <= 2; ++k) {
    for (std::int32_t j = 2; j <= 4; ++j) EXPECT_EQ(window.at(j, k), 100.0f * j + k) << j << "," << k;
  }
  EXPECT_EQ(std::vector<float>(source.data, source.data + 30), before);
  grid2DFree(window);
  grid2DFree(source);
}

TEST(FloatGrid2DTest, CopyWindowReadsNothingOutsideTheSource) {
  FloatGrid2D source = makeSource(0, 0, 3, 3);
  FloatGrid2D destination;
  destination.j0 = 1;
  destination.k0 = -1;
  destination.nj = 4;
  destination.nk = 3;
  grid2DAlloc(destination);
  for (int i = 0; i < 12; ++i) destination.data[i] = -7.0f;
  grid2DCopyWindow(destination, source);
  for (std::int32_t k = -1; k <= 1; ++k) {
    for (std::int32_t j = 1; j <= 4; ++j) {
      const bool inside = j <= 2 && k >= 0;
      EXPECT_EQ(destination.at(j, k), inside ? 100.0f * j + k : -7.0f) << j << "," << k;
    }
  }
  grid2DFree(destination);
  grid2DFree(source);
}

FloatGrid3D makeGrid3D(std::int32_t nj, std::int32_t nk, std::int32_t nl) {
  FloatGrid3D grid;
  grid.j0 = 1;
  grid.k0 = 2;
  grid.l0 = -3;
  grid.nj = nj;
  grid.nk = nk;
  grid.nl = nl;
  grid.total = std::int64_t{nj} * nk * nl;
  grid3DAlloc(grid);
  return grid;
}

TEST(FloatGrid3DTest, FillSetsEveryElementAndIndexIsXFastestZSlowest) {
  FloatGrid3D grid = makeGrid3D(4, 3, 2);
  grid3DFill(grid, 2.5f);
  for (std::int64_t i = 0; i < grid.total; ++i) EXPECT_EQ(grid.data[i], 2.5f) << i;
  grid.at(2, 4, -2) = 9.0f;
  // ((l - l0) * nk + (k - k0)) * nj + (j - j0) = (1 * 3 + 2) * 4 + 1
  EXPECT_EQ(grid.data[21], 9.0f);
  grid3DFree(grid);
  EXPECT_EQ(grid.data, nullptr);
}

TEST(FloatGrid3DTest, EmptyGridsAllocateFillAndFreeWithoutTouchingData) {
  FloatGrid3D grid = makeGrid3D(5, 0, 3);
  ASSERT_NE(grid.data, nullptr);
  // The (empty) user area is followed directly by the high guard word.
  EXPECT_EQ(std::memcmp(grid.data, "9876", 4), 0);
  grid3DFill(grid, 1.0f);
  EXPECT_EQ(std::memcmp(grid.data, "9876", 4), 0);
  grid3DFree(grid);
  grid3DFree(grid);
}

TEST(FloatGrid3DTest, ByteSizeOfLargeGridsIsFormedIn64Bits) {
  // 1024 x 1024 x 513 floats take just over 2^31 bytes, beyond a 32-bit byte count.
  FloatGrid3D grid = makeGrid3D(1024, 1024, 513);
  ASSERT_EQ(grid.total, 537919488);
  grid.data[0] = 1.0f;
  grid.data[grid.total - 1] = 2.0f;
  EXPECT_EQ(std::memcmp(grid.data + grid.total, "9876", 4), 0);
  EXPECT_EQ(grid.at(1, 2, -3), 1.0f);
  EXPECT_EQ(grid.at(1024, 1025, 509), 2.0f);
  grid3DFree(grid);
}

}  // namespace
}  // namespace karnet
