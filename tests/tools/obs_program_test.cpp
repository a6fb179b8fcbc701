// karnet-obs as users run it: projection, pressure, filters, counts and faults.
#include <gtest/gtest.h>
#include <proj.h>

#include <cmath>
#include <cstdlib>
#include <sstream>
#include <string>
#include <vector>

#include "e2e/e2e_support.h"
#include "tools/obs_argo_cdl.h"

namespace karnet::e2e {
namespace {

ProcessResult runObs(const std::vector<std::string>& args, const TempDir& dir) {
  return runProgram(KARNET_OBS_BINARY, args, dir.path());
}

std::vector<std::vector<double>> numbers(const std::string& text) {
  std::vector<std::vector<double>> rows;
  for (const std::string& line : splitLines(text)) {
    std::istringstream in(line);
    std::vector<double> row;
    double v = 0.0;
    while (in >> v) row.push_back(v);
    rows.push_back(row);
  }
  return rows;
}

// Longitude and latitude (degrees) to easting and northing of code, by PROJ directly.
std::vector<double> projected(const char* code, double lon, double lat) {
  PJ_CONTEXT* context = proj_context_create();
  PJ* raw = proj_create_crs_to_crs(context, "EPSG:4326", code, nullptr);
  PJ* transform = proj_normalize_for_visualization(context, raw);
  const PJ_COORD out = proj_trans(transform, PJ_FWD, proj_coord(lon, lat, 0, 0));
  proj_destroy(transform);
  proj_destroy(raw);
  proj_context_destroy(context);
  return {out.xy.x, out.xy.y};
}

TEST(ObsProgram, ProjectionDepthAndPressure) {
  const TempDir dir;
  writeFile(dir.file("casts.csv"),
            "station,latitude,longitude,depth,temperature\n"
            "S1,55.2,11.3,0,8.25\n"
            "S1,55.2,11.3,12.5,7.125\n"
            "S2,-33.9,18.4,4,16\n");
  for (const auto& [projection, code] :
       {std::pair{"UTM-32", "EPSG:32632"}, std::pair{"EPSG:3035", "EPSG:3035"}}) {
    const ProcessResult r = runObs({"-p", projection, "casts.csv", "-o", "obs.txt"}, dir);
    ASSERT_EQ(r.exitCode, 0) << r.err;
    const auto rows = numbers(readFile(dir.file("obs.txt")));
    ASSERT_EQ(rows.size(), 3u);
    const double lonLat[3][2] = {{11.3, 55.2}, {11.3, 55.2}, {18.4, -33.9}};
    for (int i = 0; i < 3; ++i) {
      ASSERT_EQ(rows[i].size(), 4u);
      const std::vector<double> expected = projected(code, lonLat[i][0], lonLat[i][1]);
      EXPECT_NEAR(rows[i][0], expected[0], 1e-6) << projection << " row " << i;
      EXPECT_NEAR(rows[i][1], expected[1], 1e-6) << projection << " row " << i;
    }
    EXPECT_EQ(rows[0][2], 0.0);
    EXPECT_EQ(rows[1][2], -12.5);
    EXPECT_EQ(rows[1][3], 7.125);
    EXPECT_EQ(rows[2][3], 16.0);
    EXPECT_NE(r.err.find("kept 3 of 3 rows"), std::string::npos) << r.err;
  }
  // Written to the standard output without -o; no "-0" for a zero depth.
  const ProcessResult out = runObs({"-p", "UTM-32", "casts.csv"}, dir);
  ASSERT_EQ(out.exitCode, 0);
  EXPECT_EQ(splitLines(out.out).size(), 3u);
  EXPECT_NE(splitLines(out.out)[0].find(" 0 8.25"), std::string::npos) << out.out;

  // Pressure at 4°S and 4°N: TEOS-10's check values for 1000 and 250 dbar.
  writeFile(dir.file("pressure.tsv"),
            "lon\tlat\tPRES (dbar)\tvalue\n2\t-4\t1000\t3.5\n2\t4\t250\t9\n");
  const ProcessResult p = runObs({"-p", "UTM-31S", "pressure.tsv"}, dir);
  ASSERT_EQ(p.exitCode, 0) << p.err;
  const auto rows = numbers(p.out);
  ASSERT_EQ(rows.size(), 2u);
  EXPECT_NEAR(rows[0][2], -992.0919060719987, 1e-9);
  EXPECT_NEAR(rows[1][2], -248.4700576548589, 1e-9);
}

TEST(ObsProgram, BathymetryProjectionAndArgoFiles) {
  const TempDir dir;
  BathymetrySpec b;
  b.nx = b.ny = 2;
  b.heights.assign(4, -50.0f);
  b.projection = "UTM-20";
  writeBathymetry(dir.file("bathymetry.nc"), b);
  test::ncgenFile(dir, "argo_prof.nc", test::kArgoCdl);
  const ProcessResult r =
      runObs({"--bathymetry", "bathymetry.nc", "argo_prof.nc", "-o", "obs.txt"}, dir);
  ASSERT_EQ(r.exitCode, 0) << r.err;
  const auto rows = numbers(readFile(dir.file("obs.txt")));
  // Profile 1 levels 1-2 (adjusted), profile 2 levels 1 and 3 (raw).
  ASSERT_EQ(rows.size(), 4u);
  const std::vector<double> first = projected("EPSG:32620", -60, 40);
  EXPECT_NEAR(rows[0][0], first[0], 1e-6);
  EXPECT_NEAR(rows[0][1], first[1], 1e-6);
  EXPECT_EQ(rows[0][3], 15.1);
  EXPECT_EQ(rows[1][3], 14.1);
  EXPECT_EQ(rows[2][3], 16.0);
  EXPECT_EQ(rows[3][3], 14.0);
  // 10.5 dbar at 40°N lies a little more than 10 m down; deeper means lower.
  EXPECT_LT(rows[0][2], -10.3);
  EXPECT_GT(rows[0][2], -10.5);
  EXPECT_LT(rows[1][2], rows[0][2]);
  EXPECT_NE(r.err.find("kept 4 of 9 rows; skipped: 4 bad QC flag, 1 fill value or NaN, "
                       "0 outside the time window, 0 outside the box, 0 unparsable"),
            std::string::npos)
      << r.err;
}

TEST(ObsProgram, TimeWindowAndBox) {
  const TempDir dir;
  writeFile(dir.file("casts.csv"),
            "lon;lat;depth;value;date\n"
            "10;55;5;1;2007-04-30T23:59:59\n"
            "10;55;5;2;2007-05-01\n"
            "10;55;5;3;2007-05-31T23:59\n"
            "10;55;5;4;2007-06-01\n"
            "12,5;55;5;5;2007-05-10\n"    // east of the box
            "10;57;5;6;2007-05-10\n"      // north of it
            "10;55;5;7;\n");
  const ProcessResult r = runObs({"-p", "UTM-32", "--from", "2007-05-01", "--to", "2007-05-31",
                                  "--box", "9.5,54,12,56", "casts.csv"},
                                 dir);
  ASSERT_EQ(r.exitCode, 0) << r.err;
  const auto rows = numbers(r.out);
  ASSERT_EQ(rows.size(), 2u);
  EXPECT_EQ(rows[0][3], 2.0);
  EXPECT_EQ(rows[1][3], 3.0);
  EXPECT_NE(r.err.find("kept 2 of 7 rows; skipped: 0 bad QC flag, 1 fill value or NaN, "
                       "2 outside the time window, 2 outside the box, 0 unparsable"),
            std::string::npos)
      << r.err;
  // A box across 180 degrees; a --to with a time is the last instant kept.
  writeFile(dir.file("pacific.csv"),
            "lon,lat,depth,value,time\n179.5,0,1,1,2000-01-01T06:00\n-179.5,0,1,2,2000-01-01T06:00\n"
            "-170,0,1,3,2000-01-01\n179.5,0,1,4,2000-01-01T06:01\n");
  const ProcessResult pacific =
      runObs({"-p", "EPSG:3832", "--box", "179,-1,-179,1", "--to", "2000-01-01T06:00",
              "pacific.csv"},
             dir);
  ASSERT_EQ(pacific.exitCode, 0) << pacific.err;
  const auto kept = numbers(pacific.out);
  ASSERT_EQ(kept.size(), 2u);
  EXPECT_EQ(kept[0][3], 1.0);
  EXPECT_EQ(kept[1][3], 2.0);
}

TEST(ObsProgram, BadInputStopsWithoutOutputAndHelpNeedsNone) {
  const TempDir dir;
  writeFile(dir.file("obs.txt"), "earlier result\n");
  writeFile(dir.file("text.csv"), "lon,lat,depth,value\n10,55,5,1\n10,55,five,2\n");
  writeFile(dir.file("nolat.csv"), "lon,depth,value\n10,5,1\n");
  writeFile(dir.file("lat.csv"), "lon,lat,depth,value\n10,95,5,1\n");
  writeFile(dir.file("negative.csv"), "lon,lat,depth,value\n10,55,-25,1\n");
  writeFile(dir.file("allbad.csv"), "lon,lat,depth,value\n10,55,5,NaN\n");
  writeFile(dir.file("good.csv"), "lon,lat,depth,value\n10,55,5,1\n");
  test::ncgenFile(dir, "argo_prof.nc", test::kArgoCdl);
  const std::pair<std::vector<std::string>, const char*> cases[] = {
      {{"-p", "UTM-32", "text.csv"}, "karnet-obs: text.csv:3: not a number in column 'depth': \"five\""},
      {{"-p", "UTM-32", "nolat.csv"}, "karnet-obs: nolat.csv: no latitude column"},
      {{"-p", "UTM-32", "lat.csv"}, "karnet-obs: lat.csv:2: latitude 95 is beyond"},
      {{"-p", "UTM-32", "negative.csv"}, "negative.csv:2: depth -25 m is outside"},
      {{"-p", "UTM-32", "allbad.csv"}, "no observation left to write"},
      {{"-p", "UTM-32", "missing.csv"}, "karnet-obs: missing.csv: cannot open"},
      {{"-p", "UTM-32", "."}, "karnet-obs: .: is a directory"},
      {{"-p", "LOCAL", "argo_prof.nc"}, "pressure needs a latitude"},
      {{"-p", "UTM-99", "good.csv"}, "projection 'UTM-99' not usable"},
      {{"-b", "good.csv", "good.csv"}, "good.csv: cannot read the bathymetry file"},
      {{"good.csv"}, "give either --bathymetry FILE or --projection TEXT"},
      {{"-p", "UTM-32", "--qc", "1,x", "good.csv"}, "--qc needs flags 0 to 9"},
      {{"-p", "UTM-32", "--from", "2007-02-30", "good.csv"}, "--from needs an ISO date"},
      {{"-p", "UTM-32", "--box", "1,2,3", "good.csv"}, "--box needs four numbers"},
      {{"-p", "UTM-32", "--box", "1,60,3,50", "good.csv"}, "--box latitudes must run"},
      {{"-p", "UTM-32", "--from", "2007-02-02", "--to", "2007-02-01", "good.csv"},
       "--to lies before --from"},
  };
  for (const auto& [args, expected] : cases) {
    std::vector<std::string> withOutput = args;
    withOutput.insert(withOutput.end(), {"-o", "obs.txt"});
    const ProcessResult r = runObs(withOutput, dir);
    EXPECT_EQ(r.exitCode, 1) << expected;
    EXPECT_NE(r.err.find(expected), std::string::npos) << "expected: " << expected << "\n" << r.err;
    EXPECT_EQ(readFile(dir.file("obs.txt")), "earlier result\n") << expected;
  }
  // The result never replaces an input.
  const ProcessResult same = runObs({"-p", "UTM-32", "good.csv", "-o", "./good.csv"}, dir);
  EXPECT_EQ(same.exitCode, 1);
  EXPECT_NE(same.err.find("the output ./good.csv is also an input"), std::string::npos) << same.err;
  EXPECT_EQ(readFile(dir.file("good.csv")), "lon,lat,depth,value\n10,55,5,1\n");
  // No temporary file is left behind.
  for (const std::string& name : listDir(dir.path())) {
    EXPECT_EQ(name.find(".tmp"), std::string::npos) << name;
  }
  // --skip-bad counts the row instead.
  const ProcessResult skip = runObs({"-p", "UTM-32", "--skip-bad", "text.csv"}, dir);
  EXPECT_EQ(skip.exitCode, 0);
  EXPECT_NE(skip.err.find("kept 1 of 2 rows;"), std::string::npos);
  EXPECT_NE(skip.err.find(", 1 unparsable"), std::string::npos);
  // --help and --version need no input.
  const ProcessResult help = runObs({"--help"}, dir);
  EXPECT_EQ(help.exitCode, 0);
  EXPECT_NE(help.out.find("Usage: karnet-obs"), std::string::npos);
  const ProcessResult version = runObs({"--version"}, dir);
  EXPECT_EQ(version.exitCode, 0);
  EXPECT_EQ(version.out.rfind("karnet-obs ", 0), 0u);
}

// The Argo multi-profile file of the Angola Basin example, as downloaded (a classic-format
// file whose history dimension has no records): every good measurement inside the box.
TEST(ObsProgram, ReadsTheExamplesArgoFileAsDownloaded) {
  const TempDir dir;
  const std::string argo = std::string(KARNET_SOURCE_DIR) + "/examples/angola_basin/3902131_prof.nc";
  const ProcessResult r =
      runObs({"-p", "UTM-31S", "--box", "-0.1,-9.6,5.0,-5.8", argo, "-o", "obs.txt"}, dir);
  ASSERT_EQ(r.exitCode, 0) << r.err;
  EXPECT_NE(r.err.find("kept 27401 of 56450 rows"), std::string::npos) << r.err;
  EXPECT_EQ(splitLines(readFile(dir.file("obs.txt"))).size(), 27401u);
}

}  // namespace
}  // namespace karnet::e2e
