// Complete bilinear runs: the answer, the statistics, the result file.
#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <sstream>

#include "e2e/e2e_support.h"

namespace karnet::e2e {
namespace {

double plane(double x, double y) { return 3.0 + 0.002 * (x - 1000.0) + 0.001 * (y - 2000.0); }

// A flat 21 x 21 node basin (LOCAL, origin (1000, 2000), 250 m) with casts on every fourth
// node of a field that is linear in x and y and the same at every depth.
void writePlaneCase(const TempDir& dir, ParameterFile p) {
  writeBathymetry(dir.file("bathymetry.nc"), localBasin(21, 21, 250.0, -25.0f));
  std::ostringstream obs;
  obs.precision(17);
  for (int j = 0; j <= 20; j += 4) {
    for (int i = 0; i <= 20; i += 4) {
      const double x = 1000.0 + 250.0 * i, y = 2000.0 + 250.0 * j;
      for (int level = 1; level <= 10; ++level) {
        obs << x << ' ' << y << ' ' << -2.0 * level << ' ' << plane(x, y) << '\n';
      }
    }
  }
  writeFile(dir.file("observations.txt"), obs.str());
  p.zRange = "0, 9";
  p.spacing = "2";
  p.searchRadius = "10000";
  p.filterOperations = "0";
  writeFile(dir.file("case.pfs"), p.render());
}

std::vector<int> statistics(const std::string& log) {
  std::vector<int> counts;
  for (const char* label : {"No. of bilinear interpolations          : ",
                            "No. of distance weighted interpolations : ",
                            "No. of no interpolations                : "}) {
    const auto at = log.find(label);
    if (at == std::string::npos) return {};
    counts.push_back(std::stoi(log.substr(at + std::strlen(label))));
  }
  return counts;
}

// The item is named and described after its type (3: salinity); the values reproduce the
// linear field inside the basin.
TEST(BilinearRun, ReproducesALinearFieldInsideAndDescribesTheResult) {
  TempDir dir;
  ParameterFile p;
  p.itemType = "3";
  writePlaneCase(dir, p);
  const CaseRun r = runCase(dir);
  const std::string& log = r.log;
  ASSERT_EQ(r.exitCode, 0) << log;
  EXPECT_NE(log.find("-- Completion code : Successful"), std::string::npos);
  // Every wet node of the 21 x 21 x 10 local grid that holds no cast is estimated once.
  const auto counts = statistics(log);
  ASSERT_EQ(counts.size(), 3u) << log;
  EXPECT_EQ(counts[0] + counts[1] + counts[2], 10 * (21 * 21 - 36));
  EXPECT_EQ(counts[2], 0);
  EXPECT_NE(log.find("\n-------------------------------------------------\n"
                     "Statistics for local grid:\n\n"),
            std::string::npos);

  int shape[3];
  std::string item;
  const std::vector<float> v = readResult(dir.file("result.nc"), &item, shape);
  EXPECT_EQ(item, "Salinity");
  ASSERT_EQ(shape[0], 10);
  ASSERT_EQ(shape[1], 21);
  ASSERT_EQ(shape[2], 21);
  for (int l = 0; l < 10; ++l) {
    for (int j = 1; j < 20; ++j) {
      for (int i = 1; i < 20; ++i) {
        const float value = v[(static_cast<std::size_t>(l) * 21 + j) * 21 + i];
        ASSERT_NEAR(value, plane(1000.0 + 250.0 * i, 2000.0 + 250.0 * j), 1e-4)
            << "node " << i << ", " << j << ", level " << l;
      }
    }
  }
  const ProcessResult header = runProgram("/usr/bin/ncdump", {"-h", "result.nc"}, dir.path());
  ASSERT_EQ(header.exitCode, 0) << header.err;
  // x and y are the nodes' plain metres, z their depth below the surface; the custom block
  // keeps the bathymetry's values.
  for (const char* line :
       {"time = UNLIMITED ; // (1 currently)", "z = 10 ;", "y = 21 ;", "x = 21 ;",
        "float Salinity(time, z, y, x) ;", "Salinity:units = \"1e-3\" ;",
        "Salinity:standard_name = \"sea_water_salinity\" ;", "Salinity:item_type = 3 ;",
        "crs:projection = \"LOCAL\" ;", "crs:origin_longitude = 1000. ;",
        "crs:origin_latitude = 2000. ;", "z:spacing = 2. ;", "z:positive = \"down\" ;",
        "z:standard_name = \"depth\" ;", "Salinity:grid_mapping = \"crs\" ;",
        ":title = \"karnet test case\" ;", ":source = \"karnet ",
        ":Q84_Misc = 0.f, -1.e-30f, -900.f, 10.f, -1.e-30f, -1.e-30f, -1.e-30f ;"}) {
    EXPECT_NE(header.out.find(line), std::string::npos) << line << "\n" << header.out;
  }
  // Plain metres have no place on the earth: no lon and lat.
  EXPECT_EQ(header.out.find("lon("), std::string::npos) << header.out;
  EXPECT_EQ(header.out.find("coordinates"), std::string::npos) << header.out;
  // Level l lies (lx + 1 - l) * dz below the surface: the first level 20 m, the last 2 m.
  const ProcessResult levels =
      runProgram("/usr/bin/ncdump", {"-v", "z,x", "result.nc"}, dir.path());
  EXPECT_NE(levels.out.find("z = 20, 18, 16, 14, 12, 10, 8, 6, 4, 2 ;"), std::string::npos)
      << levels.out;
  EXPECT_NE(levels.out.find("x = 1000, 1250, 1500, 1750,"), std::string::npos) << levels.out;
}

}  // namespace
}  // namespace karnet::e2e
