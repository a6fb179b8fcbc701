// Inputs found by fuzzing that once misbehaved or cost too much, read the way a run reads them.
#include <gtest/gtest.h>

#include <chrono>
#include <string>

#include "input/bathymetry_read.h"
#include "support/file_description.h"
#include "support/float_grid.h"

namespace karnet {
namespace {

std::string regression(const std::string& name) {
  return std::string(KARNET_SOURCE_DIR) + "/tests/fuzz/regressions/" + name;
}

// Classic-format files of a few hundred bytes whose headers declare gigabytes:
// an attribute of 1.7e9 floats, a variable of some 10^8 dimensions. The NetCDF
// library allocated and converted the declared sizes first (half a minute and
// 6.7 GB for the first); the reader now refuses both at once, keeping nothing.
TEST(BadFileRegression, HugeDeclarationsAreRefused) {
  for (const char* name : {"bathymetry_huge_attribute.nc", "bathymetry_huge_variable.nc"}) {
    SCOPED_TRACE(name);
    FileDescription* description = descriptionNew(2);
    ASSERT_NE(description, nullptr);
    FloatGrid2D grid{};
    const auto start = std::chrono::steady_clock::now();
    EXPECT_EQ(bathymetryRead(regression(name).c_str(), *description, 1, grid), 0);
    EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(2));
    EXPECT_EQ(grid.data, nullptr);
    descriptionFree(description);
  }
}

}  // namespace
}  // namespace karnet
