// Complete bilinear runs: the answer, the statistics, the result file, interruptions.
#include <gtest/gtest.h>
#include <signal.h>

#include <cmath>
#include <cstring>
#include <tuple>
#include <filesystem>
#include <sstream>

#include "e2e/e2e_support.h"

namespace karnet::e2e {
namespace {

const std::map<std::string, std::string> kQuiet = {{"buildmode", "nigth"}};

double plane(double x, double y) { return 3.0 + 0.002 * (x - 1000.0) + 0.001 * (y - 2000.0); }

// A flat 21 x 21 node basin (LOCAL, origin (1000, 2000), 250 m) with casts on every fourth
// node of a field that is linear in x and y and the same at every depth.
void writePlaneCase(const TempDir& dir, ParameterFile p) {
  BathymetrySpec b;
  b.nx = 21;
  b.ny = 21;
  b.projection = "LOCAL";
  b.originLongitude = 1000.0;
  b.originLatitude = 2000.0;
  b.heights.assign(21 * 21, -25.0f);
  writeBathymetry(dir.file("bathymetry.nc"), b);
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
  p.projection = "'LOCAL'";
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

TEST(BilinearRun, ReproducesALinearFieldInside) {
  TempDir dir;
  writePlaneCase(dir, ParameterFile{});
  const ProcessResult r = runKarnet({"case.pfs"}, dir.path(), kQuiet);
  const std::string log = readFile(dir.file("case.log"));
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
  EXPECT_EQ(item, "Temperature");
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
}

TEST(BilinearRun, ResultFileCarriesItsDescription) {
  TempDir dir;
  ParameterFile p;
  p.itemType = "3";
  writePlaneCase(dir, p);
  ASSERT_EQ(runKarnet({"case.pfs"}, dir.path(), kQuiet).exitCode, 0);
  const ProcessResult header = runProgram("/usr/bin/ncdump", {"-h", "result.nc"}, dir.path());
  ASSERT_EQ(header.exitCode, 0) << header.err;
  // The item is named and described after its type; x and y are the nodes' plain metres,
  // z their depth below the surface; the custom block keeps the bathymetry's values.
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

TEST(BilinearRun, FailedWriteIsAnErrorAndLeavesNoFile) {
  TempDir dir;
  ParameterFile p;
  p.outputFileName = "|no/such/dir/result.nc|";
  writePlaneCase(dir, p);
  const ProcessResult r = runKarnet({"case.pfs"}, dir.path(), kQuiet);
  EXPECT_EQ(r.exitCode, 1);
  const std::string log = readFile(dir.file("case.log"));
  EXPECT_NE(log.find("\nERROR while writing result file\n"), std::string::npos) << log;
  EXPECT_NE(log.find("-- Completion code : Abnormal"), std::string::npos);
  EXPECT_EQ(listDir(dir.path()).size(), 4u);  // the inputs and the log only
}

// A large case, so that a signal arrives while the run is computing.
void writeLargeCase(const TempDir& dir) {
  const int n = 1200;
  BathymetrySpec b;
  b.nx = n;
  b.ny = n;
  b.spacing = 50.0;
  b.projection = "LOCAL";
  b.heights.assign(static_cast<std::size_t>(n) * n, -60.0f);
  writeBathymetry(dir.file("bathymetry.nc"), b);
  std::ostringstream obs;
  for (int j = 0; j < n; j += 150) {
    for (int i = 0; i < n; i += 150) {
      for (int level = 1; level <= 29; ++level) {
        obs << 50.0 * i << ' ' << 50.0 * j << ' ' << -2.0 * level << ' ' << 5 + 0.1 * level << '\n';
      }
    }
  }
  writeFile(dir.file("observations.txt"), obs.str());
  ParameterFile p;
  p.projection = "'LOCAL'";
  p.zRange = "0, 29";
  p.spacing = "2";
  p.searchRadius = "20000";
  writeFile(dir.file("case.pfs"), p.render());
}

// Waits until the run has scanned its data, then sends the signal once.
std::function<bool(int)> signalAfterScan(const TempDir& dir, int signal) {
  return [&dir, signal](int pid) {
    if (readFile(dir.file("case.log")).find("Number of z-nodes") == std::string::npos) {
      return false;
    }
    kill(pid, signal);
    return true;
  };
}

TEST(BilinearRun, InterruptsEndTheRunWithTheSignalsCode) {
  const std::vector<std::tuple<int, const char*>> interrupts = {
      {SIGINT, "Control-C send"}, {SIGTERM, "Termination reques"}};
  for (const auto& [signal, message] : interrupts) {
    TempDir dir;
    writeLargeCase(dir);
    writeFile(dir.file("result.nc"), "an earlier result");
    const ProcessResult r =
        runKarnet({"case.pfs"}, dir.path(), kQuiet, signalAfterScan(dir, signal));
    EXPECT_EQ(r.termSignal, 0);
    EXPECT_EQ(r.exitCode, signal);
    const std::string log = readFile(dir.file("case.log"));
    EXPECT_NE(log.find(std::string(message) + "\n"), std::string::npos) << log;
    EXPECT_NE(log.find("-- Completion code : Abnormal"), std::string::npos) << log;
    // The earlier result is untouched and no partial file is left behind.
    EXPECT_EQ(readFile(dir.file("result.nc")), "an earlier result");
    EXPECT_EQ(listDir(dir.path()).size(), 5u);
  }
}

TEST(BilinearRun, HostCancelEndsTheRunSuccessfullyWithoutResult) {
  TempDir dir;
  writeLargeCase(dir);
  const ProcessResult r =
      runKarnet({"//apv", "case.pfs"}, dir.path(), kQuiet, signalAfterScan(dir, SIGUSR1));
  EXPECT_EQ(r.exitCode, 0);
  const std::string log = readFile(dir.file("case.log"));
  // The host shows the cancel; the log only ends.
  EXPECT_NE(r.err.find("Cancel computation"), std::string::npos) << r.err;
  EXPECT_NE(log.find("-- Completion code : Successful"), std::string::npos) << log;
  EXPECT_FALSE(fileExists(dir.file("result.nc")));
}

}  // namespace
}  // namespace karnet::e2e
