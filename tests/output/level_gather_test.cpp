// The result written level by level: each level cut out of the levels a
// process holds, and a file that appears only when every level is in.
#include "output/level_gather.h"

#include <gtest/gtest.h>
#include <netcdf.h>

#include <cstdint>
#include <string>
#include <vector>

#include "gridfile/nc_test_files.h"
#include "interp/glo2loc.h"
#include "output/result_write.h"
#include "params/run_settings.h"
#include "state/run_state.h"
#include "support/file_description.h"

namespace karnet {
namespace {

constexpr float kEmpty = kDeleteValueFloat;

// A basic grid of 8 x 6 x 7 nodes whose node (j, k, l) holds 1000 l + 10 k + j.
void fillBasic(FloatGrid3D& g, std::int32_t l0, std::int32_t nl) {
  g = FloatGrid3D{0, 0, l0, 8, 6, nl, 1, 1, 1, std::int64_t{8} * 6 * nl, nullptr};
  grid3DAlloc(g);
  for (std::int32_t l = l0; l < l0 + nl; ++l)
    for (std::int32_t k = 0; k < 6; ++k)
      for (std::int32_t j = 0; j < 8; ++j) g.at(j, k, l) = static_cast<float>(1000 * l + 10 * k + j);
}

TEST(LevelGather, EachLevelAsTheWholeExtraction) {
  // Windows inside the basic grid and reaching past its edges.
  const struct {
    std::int32_t jOff, kOff, lOff, nx, ny, nz;
  } windows[] = {{1, 2, 1, 5, 3, 4}, {0, 0, 0, 8, 6, 7}, {5, 4, 4, 5, 4, 4}};
  for (const auto& w : windows) {
    SCOPED_TRACE(testing::Message() << w.jOff << "," << w.kOff << "," << w.lOff);
    RunState whole;
    fillBasic(whole.basicValues, 0, 7);
    whole.localValues = FloatGrid3D{0, 0, 3, w.nx, w.ny, w.nz, 1, 1, 1,
                                    std::int64_t{w.nx} * w.ny * w.nz, nullptr};
    grid3DAlloc(whole.localValues);
    RunSettings settings;
    glo2loc(w.jOff, w.kOff, w.lOff, whole, settings);

    // A process holding basic levels 2 .. 4 only.
    RunState part;
    fillBasic(part.basicValues, 2, 3);
    part.window = LocalWindow{w.jOff, w.kOff, w.lOff, 3, 3 + w.nz - 1, 1.0f};
    std::vector<float> level(static_cast<std::size_t>(w.nx * w.ny));
    const std::int64_t layer = std::int64_t{w.nx} * w.ny;
    for (std::int32_t s = 0; s < w.nz; ++s) {
      extractResultLevel(part, s, w.nx, w.ny, level.data());
      const bool held = w.lOff + s >= 2 && w.lOff + s <= 4;
      for (std::int64_t n = 0; n < layer; ++n) {
        ASSERT_EQ(level[n], held ? whole.localValues.data[s * layer + n] : kEmpty)
            << "level " << s << " node " << n;
      }
    }
    // The cut-out reaches the basic grid's far edge: those nodes stay empty.
    if (w.jOff + w.nx > 8) {
      whole.window = part.window;
      extractResultLevel(whole, 0, w.nx, w.ny, level.data());
      EXPECT_EQ(level[w.nx - 1], kEmpty);
      EXPECT_EQ(level[0], static_cast<float>(1000 * w.lOff + 10 * w.kOff + w.jOff));
    }
    releaseAll(whole);
    releaseAll(part);
  }
}

// A result of 4 x 3 x 5 nodes in plain metres.
struct Result {
  FileDescription* d = descriptionNew(3);
  Result() {
    const std::int32_t last[3] = {3, 2, 4};
    for (int a = 0; a < 3; ++a) {
      d->axes[a + 1].origin = a == 2 ? -25.0 : 100.0 * (a + 1);
      d->axes[a + 1].spacing = a == 2 ? 5.0f : 50.0f;
      d->axes[a + 1].lastIndex = last[a];
      d->axes[a + 1].factor = 1.0f;
    }
  }
  ~Result() { descriptionFree(d); }
};

TEST(LevelGather, LevelByLevelGivesTheFileOfTheWholeGrid) {
  test::TempDir dir;
  const Result result;
  FloatGrid3D values{0, 0, 0, 4, 3, 5, 1, 1, 1, 60, nullptr};
  grid3DAlloc(values);
  for (int n = 0; n < 60; ++n) values.data[n] = n % 7 == 0 ? kEmpty : 0.25f * static_cast<float>(n);
  const TextAttributes attributes = {{"history", "fixed"}};

  ASSERT_EQ(resultWrite(dir.file("whole.nc").c_str(), *result.d, 1, 2, values, "LOCAL",
                        &attributes), 1);
  std::vector<std::int32_t> asked;
  const ResultLevelSource levels = [&](std::int32_t s, float* buffer) {
    asked.push_back(s);
    std::copy(values.data + s * 12, values.data + (s + 1) * 12, buffer);
    return true;
  };
  ASSERT_EQ(resultWriteLevels(dir.file("levels.nc").c_str(), *result.d, 2, levels, "LOCAL",
                              &attributes), 1);
  EXPECT_EQ(asked, (std::vector<std::int32_t>{0, 1, 2, 3, 4}));
  EXPECT_EQ(test::readBytes(dir.file("whole.nc")), test::readBytes(dir.file("levels.nc")));

  // The values as any NetCDF reader sees them: level s is z index s.
  int ncid = -1, varid = -1;
  ASSERT_EQ(nc_open(dir.file("levels.nc").c_str(), NC_NOWRITE, &ncid), NC_NOERR);
  ASSERT_EQ(nc_inq_varid(ncid, "Temperature", &varid), NC_NOERR);
  std::vector<float> read(60);
  ASSERT_EQ(nc_get_var_float(ncid, varid, read.data()), NC_NOERR);
  nc_close(ncid);
  EXPECT_EQ(read, std::vector<float>(values.data, values.data + 60));
  grid3DFree(values);
}

TEST(LevelGather, ALevelThatFailsLeavesNoFileAndKeepsTheEarlierOne) {
  test::TempDir dir;
  const Result result;
  const std::string path = dir.file("result.nc");
  test::writeBytes(path, "earlier result");
  std::int32_t calls = 0;
  const ResultLevelSource failsAtThree = [&](std::int32_t s, float* buffer) {
    ++calls;
    std::fill(buffer, buffer + 12, 1.0f);
    return s < 3;
  };
  EXPECT_EQ(resultWriteLevels(path.c_str(), *result.d, 2, failsAtThree, "LOCAL"), 0);
  EXPECT_EQ(calls, 4);  // no level asked for after the failed one
  EXPECT_EQ(test::readBytes(path), "earlier result");
  std::vector<std::string> names;
  for (const auto& entry : std::filesystem::directory_iterator(dir.path()))
    names.push_back(entry.path().filename().string());
  EXPECT_EQ(names, std::vector<std::string>{"result.nc"});  // no temporary left behind
}

}  // namespace
}  // namespace karnet
