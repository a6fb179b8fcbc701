// The lines a run leaves on stderr: the summary at its end, and bad observation lines.
#include <gtest/gtest.h>

#include <cstring>
#include <sstream>

#include "e2e/e2e_support.h"

namespace karnet::e2e {
namespace {

const std::map<std::string, std::string> kBatch = {{"buildmode", "nigth"}};

// A 10 x 10 node LOCAL basin of 100 m cells, 50 m deep, with land (the land value) in its
// two western columns; ten 5 m levels. Observations: three in the water, one on land, one
// below the bed, two outside the grid on either side.
void writeSummaryCase(const TempDir& dir) {
  BathymetrySpec b;
  b.nx = 10;
  b.ny = 10;
  b.spacing = 100.0;
  b.projection = "LOCAL";
  b.originLongitude = 0.0;
  b.originLatitude = 0.0;
  b.heights.assign(100, -50.0f);
  for (int j = 0; j < 10; ++j) b.heights[j * 10] = b.heights[j * 10 + 1] = 10.0f;
  writeBathymetry(dir.file("bathymetry.nc"), b);
  writeFile(dir.file("observations.txt"),
            "500 500 -10 5\n"
            "500 500 -20 4\n"
            "620 580 -30 3\n"
            "0 500 -5 6\n"
            "600 600 -60 2\n"
            "5000 500 -10 1\n"
            "-300 500 -10 1\n");
  ParameterFile p;
  p.projection = "'LOCAL'";
  p.zRange = "0, 9";
  p.spacing = "5";
  p.searchRadius = "1000";
  writeFile(dir.file("case.pfs"), p.render());
}

TEST(RunSummary, CountsWhereTheObservationsLie) {
  TempDir dir;
  writeSummaryCase(dir);
  const ProcessResult r = runKarnet({"case.pfs"}, dir.path(), kBatch);
  ASSERT_EQ(r.exitCode, 0) << readFile(dir.file("case.log"));

  // Wet nodes: 80 water columns, each wet at the nine levels above its bed (-45 .. -5 m).
  int shape[3];
  std::string item;
  const std::vector<float> v = readResult(dir.file("result.nc"), &item, shape);
  ASSERT_EQ(v.size(), 1000u);
  int estimated = 0;
  for (int l = 1; l < 10; ++l) {
    for (int j = 0; j < 10; ++j) {
      for (int i = 2; i < 10; ++i) estimated += v[(l * 10 + j) * 10 + i] != -1e-30f ? 1 : 0;
    }
  }
  ASSERT_GT(estimated, 0);
  const std::string expected =
      "karnet: result: " + std::string("result.nc") + "\n" +
      "karnet: grid: 10 x 10 x 10 nodes, " + std::to_string(estimated) +
      " of 720 wet nodes estimated\n"
      "karnet: observations: 7 read, 3 used (in the water inside the grid), 2 outside the grid, "
      "1 on land, 1 below the bed\n";
  EXPECT_NE(r.err.find(expected.substr(expected.find("karnet: grid"))), std::string::npos)
      << r.err;
  EXPECT_NE(r.err.find("karnet: result: "), std::string::npos) << r.err;
  EXPECT_NE(r.err.find("result.nc\n"), std::string::npos) << r.err;
  EXPECT_EQ(r.err.find("warning"), std::string::npos) << r.err;

  // The log is as it always was: no summary in it.
  EXPECT_EQ(readFile(dir.file("case.log")).find("karnet:"), std::string::npos);
}

TEST(RunSummary, QuietRunSaysNothing) {
  TempDir dir;
  writeSummaryCase(dir);
  for (const char* where : {"first", "between"}) {
    const std::vector<std::string> args =
        std::strcmp(where, "first") == 0 ? std::vector<std::string>{"--quiet", "case.pfs"}
                                         : std::vector<std::string>{"-debug", "--QUIET", "case.pfs"};
    const ProcessResult r = runKarnet(args, dir.path(), kBatch);
    EXPECT_EQ(r.exitCode, 0) << where;
    EXPECT_EQ(r.err, "") << where;
  }
  // Not before the parameter file: the usage is broken.
  const ProcessResult late = runKarnet({"case.pfs", "--quiet"}, dir.path(), kBatch);
  EXPECT_EQ(late.exitCode, 1);
  // --help tells of it.
  const ProcessResult help = runKarnet({"--help"}, dir.path());
  EXPECT_NE(help.out.find("--quiet"), std::string::npos) << help.out;
}

TEST(RunSummary, BadObservationLineIsNamedOnStderr) {
  const std::vector<std::pair<std::string, std::string>> cases = {
      {"lon lat z value\n1 2 -3 4\n", ":1: not a number: \"lon\"\n"},
      {"500 500 -10 5\n500 500 -10\n", ":2: 4 numbers expected (x y z value), found 3\n"},
      {"500 500 -10 5\n\n", ":2: empty line\n"},
      {"500 500 -10 inf\n", ":1: not a finite number: \"inf\"\n"},
  };
  for (const auto& [text, message] : cases) {
    TempDir dir;
    writeSummaryCase(dir);
    writeFile(dir.file("observations.txt"), text);
    // Also with --quiet and in batch mode: this is the error that stops the run.
    const ProcessResult r = runKarnet({"--quiet", "case.pfs"}, dir.path(), kBatch);
    EXPECT_EQ(r.exitCode, 1) << text;
    EXPECT_NE(r.err.find("karnet: "), std::string::npos) << r.err;
    EXPECT_NE(r.err.find("observations.txt" + message), std::string::npos) << r.err;
    // The log keeps its own lines.
    const std::string log = readFile(dir.file("case.log"));
    EXPECT_NE(log.find("\nERROR while reading water file\n      line number: " +
                       message.substr(1, message.find(':', 1) - 1) + "\n"),
              std::string::npos)
        << log;
    EXPECT_FALSE(fileExists(dir.file("result.nc")));
  }
}

}  // namespace
}  // namespace karnet::e2e
