// Inputs found by fuzzing that once misbehaved or cost too much, read the way a run reads them.
#include <gtest/gtest.h>

#include <string>

#include "input/bathymetry_read.h"
#include "support/file_description.h"
#include "support/float_grid.h"

namespace karnet {
namespace {

std::string regression(const std::string& name) {
  return std::string(KARNET_SOURCE_DIR) + "/tests/fuzz/regressions/" + name;
}

// A 613-byte classic-format file whose header declares an attribute of
// gigabytes: the NetCDF library's allocation either fails or the read runs
// past the end of the file; either way the reader says no and nothing is kept.
TEST(BadFileRegression, HugeDeclaredAttributeIsRefused) {
  FileDescription* description = descriptionNew(2);
  ASSERT_NE(description, nullptr);
  FloatGrid2D grid{};
  EXPECT_EQ(bathymetryRead(regression("bathymetry_huge_attribute.nc").c_str(), *description, 1,
                           grid),
            0);
  EXPECT_EQ(grid.data, nullptr);
  descriptionFree(description);
}

}  // namespace
}  // namespace karnet
