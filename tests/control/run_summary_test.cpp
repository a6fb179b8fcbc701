// The end-of-run summary: wet nodes counted by the bathymetry scan's rule, and
// the lines written, with the projection warning.
#include "control/run_summary.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <cstdlib>
#include <string>
#include <vector>

#include "params/run_settings.h"
#include "support/file_description.h"
#include "support/float_grid.h"

namespace karnet {
namespace {

TEST(RunSummary, WetNodesAndTheirEstimates) {
  // Six columns (3 x 2), land value 10, five levels 1 m apart at heights -5 .. -1.
  std::vector<float> beds = {-4.5f, 10.0f, -0.5f, 20.0f, -100.0f, -2.0f};
  FloatGrid2D bed;
  bed.nj = 3;
  bed.nk = 2;
  bed.data = beds.data();
  RunSettings s;
  s.l0 = 0;
  s.lx = 4;
  s.dz = 1.0f;
  std::vector<float> values(30, kDeleteValueFloat);
  FloatGrid3D grid;
  grid.nj = 3;
  grid.nk = 2;
  grid.nl = 5;
  grid.total = 30;
  grid.data = values.data();
  // Estimates at the deep column's every level, the top of the shallow column, and at
  // two dry nodes (a land column, and below the bed of the first), which do not count.
  for (int l = 0; l < 5; ++l) values[l * 6 + 4] = 1.0f;
  values[4 * 6 + 2] = 0.0f;
  values[4 * 6 + 1] = 1.0f;
  values[0 * 6 + 0] = 1.0f;
  RunSummary r;
  countResultNodes(bed, 10.0, s, grid, &r);
  EXPECT_EQ(r.nx, 3);
  EXPECT_EQ(r.ny, 2);
  EXPECT_EQ(r.nz, 5);
  // 4 (bed -4.5: heights -1 .. -4) + 1 (bed -0.5: top only) + 5 (bed -100)
  // + 1 (bed -2: the level at -2 lies on the bed, dry); land columns none.
  EXPECT_EQ(r.wetNodes, 11);
  EXPECT_EQ(r.estimatedNodes, 6);
}

std::string printed(const RunSummary& r, bool quiet) {
  char* text = nullptr;
  std::size_t size = 0;
  std::FILE* stream = open_memstream(&text, &size);
  printRunSummary(stream, r, quiet);
  std::fclose(stream);
  std::string out(text, size);
  std::free(text);
  return out;
}

TEST(RunSummary, LinesAndTheProjectionWarning) {
  RunSummary r;
  r.resultPath = "out/result.nc";
  r.nx = 80;
  r.ny = 60;
  r.nz = 20;
  r.wetNodes = 4000;
  r.estimatedNodes = 3990;
  r.observations = {100, 90, 4, 3, 3};
  EXPECT_EQ(printed(r, false),
            "karnet: result: out/result.nc\n"
            "karnet: grid: 80 x 60 x 20 nodes, 3990 of 4000 wet nodes estimated\n"
            "karnet: observations: 100 read, 90 used (in the water inside the grid), "
            "4 outside the grid, 3 on land, 3 below the bed\n");
  EXPECT_EQ(printed(r, true), "");

  // 5 % inside is enough; fewer gets the warning, also when quiet.
  r.observations = {100, 5, 95, 0, 0};
  EXPECT_EQ(printed(r, true), "");
  r.observations = {100, 2, 96, 1, 1};
  const std::string warning =
      "karnet: warning: only 4 of 100 observations lie inside the grid: check the projection\n";
  EXPECT_EQ(printed(r, true), warning);
  EXPECT_NE(printed(r, false).find(warning), std::string::npos);
  r.observations = {};
  EXPECT_EQ(printed(r, true), "");
}

}  // namespace
}  // namespace karnet
