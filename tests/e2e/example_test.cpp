// The shipped basin example, run the way the README tells users to, and its result opened
// with the tools they use.
#include <gtest/gtest.h>

#include <filesystem>

#include "e2e/e2e_support.h"

namespace karnet::e2e {
namespace {

TEST(Example, BasinRunsAndItsResultOpensInNcdumpAndXarray) {
  TempDir dir;
  const std::string example = std::string(KARNET_SOURCE_DIR) + "/examples/basin/";
  for (const char* name : {"basin.asc", "casts.txt", "basin.pfs", "basin_oa.pfs"}) {
    std::filesystem::copy_file(example + name, dir.file(name));
  }
  const ProcessResult made =
      runProgram(KARNET_MKGRID_BINARY,
                 {"--projection", "UTM-32", "--orientation", "15", "basin.asc", "bathymetry.nc"},
                 dir.path());
  ASSERT_EQ(made.exitCode, 0) << made.err;

  for (const char* pfs : {"basin.pfs", "basin_oa.pfs"}) {
    const ProcessResult run = runKarnet({pfs}, dir.path(), {{"buildmode", "nigth"}});
    ASSERT_EQ(run.exitCode, 0) << pfs;
  }
  const std::string log = readFile(dir.file("basin.log"));
  EXPECT_NE(log.find("-- Completion code : Successful"), std::string::npos) << log;

  const ProcessResult header = runProgram("/usr/bin/ncdump", {"-h", "result_bilinear.nc"},
                                          dir.path());
  ASSERT_EQ(header.exitCode, 0) << header.err;
  for (const char* line :
       {"float Temperature(time, z, y, x) ;", "Temperature:units = \"degree_Celsius\" ;",
        "Temperature:standard_name = \"sea_water_temperature\" ;",
        "Temperature:coordinates = \"lon lat\" ;", "crs:projection = \"UTM-32\" ;",
        "crs:grid_mapping_name = \"transverse_mercator\" ;",
        "crs:orientation = 15. ;", ":Conventions = \"CF-1.8\" ;", "x:units = \"m\" ;"}) {
    EXPECT_NE(header.out.find(line), std::string::npos) << line << "\n" << header.out;
  }
  // The grid is turned 15 degrees against north: no tool may place it through x and y.
  EXPECT_EQ(header.out.find("Temperature:grid_mapping"), std::string::npos) << header.out;

  // Both methods give a plausible temperature field: warm at the top, cold at the bottom,
  // dry nodes and nodes out of reach masked.
  const ProcessResult py = runProgram(
      "/usr/bin/python3",
      {"-c",
       "import xarray as xr, numpy as np\n"
       "for name in ('result_bilinear.nc', 'result_objective.nc'):\n"
       "    t = xr.open_dataset(name)['Temperature'].isel(time=0)\n"
       "    top = float(t.isel(z=-1).mean()); low = float(t.isel(z=4).mean())\n"
       "    print(name, t.dims, t.shape, 15 < top < 17, 5 < low < 8,\n"
       "          0.3 < float(t.isnull().mean()) < 0.8)\n"},
      dir.path());
  ASSERT_EQ(py.exitCode, 0) << py.err;
  EXPECT_EQ(py.out,
            "result_bilinear.nc ('z', 'y', 'x') (20, 60, 80) True True True\n"
            "result_objective.nc ('z', 'y', 'x') (20, 60, 80) True True True\n");
}

}  // namespace
}  // namespace karnet::e2e
