// karnet-obs: Argo profile files.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "common/temp_dir.h"
#include "obs/argo_reader.h"
#include "tools/obs_argo_cdl.h"

namespace karnet::obs {
namespace {

using test::kArgoCdl;
using test::ncgenFile;
using test::TempDir;

struct Read {
  std::vector<Row> rows;
  std::vector<std::string> where;
  std::vector<std::string> notes;
};

Read readFile(const std::string& path, const ReadOptions& options = {}) {
  Read out;
  readArgo(
      path, options,
      [&out](const Row& row, const Where& where) {
        out.rows.push_back(row);
        out.where.push_back(where());
      },
      [&out](const std::string& note) { out.notes.push_back(note); });
  return out;
}

std::string errorOf(const std::string& path, const ReadOptions& options = {}) {
  try {
    readFile(path, options);
  } catch (const ObsError& e) {
    return e.what();
  }
  return "(no error)";
}

// (vertical, value, skip) of every row.
struct Level {
  double pressure;
  double value;
  Skip skip;
  bool operator==(const Level&) const = default;
};
std::vector<Level> levels(const Read& read) {
  std::vector<Level> out;
  for (const Row& row : read.rows) out.push_back({row.vertical, row.value, row.skip});
  return out;
}

TEST(ObsArgo, AdjustedWhereTheDataModeSaysSoFlagsAndFills) {
  const TempDir dir;
  const std::string path = ncgenFile(dir, "argo_prof.nc", kArgoCdl);
  EXPECT_TRUE(looksLikeNetcdf(path));
  EXPECT_FALSE(looksLikeNetcdf(dir.file("argo_prof.nc.cdl")));

  const Read r = readFile(path);
  // Single-precision values come as the decimals written (15.1, not 15.100000381...).
  const std::vector<Level> expected = {
      {10.5, 15.1, Skip::None},  {20.5, 14.1, Skip::None},  {30.5, 13.1, Skip::BadQc},
      {5, 16, Skip::None},       {15, 16, Skip::Missing},    {25, 14, Skip::None},
      {35, 13, Skip::BadQc},     {100.2, 9.1, Skip::BadQc}, {200.2, 8.1, Skip::BadQc},
  };
  ASSERT_EQ(r.rows.size(), expected.size());
  for (std::size_t i = 0; i < expected.size(); ++i) {
    const Level got = levels(r)[i];
    EXPECT_EQ(got.pressure, expected[i].pressure) << i;
    if (got.skip != Skip::Missing) {
      EXPECT_EQ(got.value, expected[i].value) << i;
    }
    EXPECT_EQ(got.skip, expected[i].skip) << i;
  }
  EXPECT_TRUE(r.rows[0].isPressure);
  EXPECT_EQ(r.rows[0].lon, -60.0);
  EXPECT_EQ(r.rows[3].lat, 41.0);
  EXPECT_EQ(*r.rows[0].time, 20939.5);
  EXPECT_EQ(*r.rows[3].time, 20940.5);
  EXPECT_FALSE(r.rows[7].time.has_value());
  EXPECT_EQ(r.where[2], path + ": profile 1, level 3 (adjusted values)");
  EXPECT_EQ(r.where[6], path + ": profile 2, level 4");
  EXPECT_TRUE(r.notes.empty());

  // Raw values on request; other flags accepted on request.
  ReadOptions raw;
  raw.raw = true;
  raw.goodFlags = {'0', '1', '3', '4'};  // profile 3's blank JULD_QC counts as 0
  const Read rr = readFile(path, raw);
  ASSERT_EQ(rr.rows.size(), 9u);
  EXPECT_EQ(levels(rr)[2], (Level{30, 13, Skip::None}));
  EXPECT_EQ(levels(rr)[6], (Level{35, 13, Skip::None}));
  EXPECT_EQ(levels(rr)[7], (Level{100, 9, Skip::None}));

  // A time window needs a date: profile 3 has none.
  ReadOptions window;
  window.needTime = true;
  EXPECT_EQ(readFile(path, window).rows[7].skip, Skip::Missing);
}

// A single-profile file without DATA_MODE, flags or date: adjusted values are taken where
// present, the missing flags are not checked and said so.
TEST(ObsArgo, SingleProfileWithoutModeOrFlags) {
  const TempDir dir;
  const std::string path = ncgenFile(dir, "R1234_001.nc", R"(netcdf single {
dimensions:
  N_PROF = 1 ;
  N_LEVELS = 2 ;
variables:
  double LATITUDE(N_PROF) ;
  double LONGITUDE(N_PROF) ;
  double PRES(N_PROF, N_LEVELS) ;
  double PRES_ADJUSTED(N_PROF, N_LEVELS) ;
  double PSAL(N_PROF, N_LEVELS) ;
  double PSAL_ADJUSTED(N_PROF, N_LEVELS) ;
    PSAL_ADJUSTED:_FillValue = 99999. ;
data:
  LATITUDE = -10 ;
  LONGITUDE = 3 ;
  PRES = 1, 2 ;
  PRES_ADJUSTED = 1.5, 2.5 ;
  PSAL = 35, 35.5 ;
  PSAL_ADJUSTED = 35.01, _ ;
}
)");
  ReadOptions options;
  options.variable = "psal";
  const Read r = readFile(path, options);
  ASSERT_EQ(r.rows.size(), 2u);
  EXPECT_EQ(levels(r)[0], (Level{1.5, 35.01, Skip::None}));
  EXPECT_EQ(r.rows[1].skip, Skip::Missing);  // the adjusted value is missing; no raw fallback
  EXPECT_EQ(r.notes.size(), 3u);  // POSITION_QC, PRES_QC and PSAL_QC; no JULD, so no JULD_QC
  EXPECT_NE(r.notes[0].find("no POSITION_QC"), std::string::npos);
}

TEST(ObsArgo, FaultsAreNamed) {
  const TempDir dir;
  const std::string argo = ncgenFile(dir, "argo_prof.nc", kArgoCdl);
  ReadOptions doxy;
  doxy.variable = "DOXY";
  EXPECT_NE(errorOf(argo, doxy).find("argo_prof.nc: no variable DOXY"), std::string::npos);
  const std::string grid = ncgenFile(dir, "grid.nc",
                                     "netcdf g { dimensions: x = 2 ; variables: float h(x) ; }");
  EXPECT_NE(errorOf(grid).find("grid.nc: no dimension N_PROF"), std::string::npos);
  const std::string badShape = ncgenFile(dir, "shape.nc", R"(netcdf s {
dimensions: N_PROF = 1 ; N_LEVELS = 2 ;
variables: double LATITUDE(N_PROF) ; double LONGITUDE(N_PROF) ; double PRES(N_LEVELS) ;
  double TEMP(N_PROF, N_LEVELS) ;
})");
  EXPECT_NE(errorOf(badShape).find("variable PRES does not lie on the dimensions"),
            std::string::npos);
  const std::string badUnits = ncgenFile(dir, "units.nc", R"(netcdf u {
dimensions: N_PROF = 1 ; N_LEVELS = 1 ;
variables: double LATITUDE(N_PROF) ; double LONGITUDE(N_PROF) ; double PRES(N_PROF, N_LEVELS) ;
  double TEMP(N_PROF, N_LEVELS) ; double JULD(N_PROF) ; JULD:units = "seconds since 1970-01-01" ;
})");
  EXPECT_NE(errorOf(badUnits).find("JULD has units \"seconds since 1970-01-01\""),
            std::string::npos);
  EXPECT_NE(errorOf(dir.file("absent.nc")).find("absent.nc: cannot read as NetCDF"),
            std::string::npos);
}

}  // namespace
}  // namespace karnet::obs
