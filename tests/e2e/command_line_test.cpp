// The program's command line, log placement, parameter-file failures and the summary it leaves
// on stderr, run as a user would.
#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>

#include "e2e/e2e_support.h"

namespace karnet::e2e {
namespace {

const std::string kUsage = "Usage: karnet.exe [//apv] [options] pfs-file";

std::string runTimeBlock(const char* completion) {
  return std::string("\n--------------- RUN TIME INFORMATION --------------\n--\n") +
         "-- CPU time        : 0 [s]\n--\n-- Completion code : " + completion +
         "\n--\n---------------------------------------------------\n";
}

TEST(CommandLine, UsageWhenThereIsNoParameterFile) {
  TempDir dir;
  for (const auto& args : std::vector<std::vector<std::string>>{
           {}, {"case.pfs", "//apv"}, {"case.pfs", "//APV"}, {"case.pfs", "-debug"}}) {
    const ProcessResult r = runKarnet(args, dir.path());
    EXPECT_EQ(r.exitCode, 1);
    EXPECT_TRUE(contains(r.err, kUsage)) << r.err;
    // Nothing was named as parameter file, so no log may appear.
    EXPECT_TRUE(listDir(dir.path()).empty());
  }
}

// Libraries are never looked for in the folder a run starts in: a file there named like one
// the program needs must not be loaded.
TEST(CommandLine, LibrariesAreNotTakenFromTheWorkingDirectory) {
  const ProcessResult needed = runProgram("/usr/bin/ldd", {KARNET_BINARY}, ".");
  ASSERT_EQ(needed.exitCode, 0) << needed.err;
  TempDir dir;
  int planted = 0;
  for (const std::string& line : splitLines(needed.out)) {
    const std::size_t arrow = line.find(" => ");
    if (arrow == std::string::npos) continue;
    const std::size_t start = line.find_first_not_of(" \t");
    writeFile(dir.file(line.substr(start, arrow - start)), "not a library\n");
    ++planted;
  }
  ASSERT_GT(planted, 3) << needed.out;
  const ProcessResult r = runKarnet({}, dir.path());
  EXPECT_EQ(r.exitCode, 1) << r.err;
  EXPECT_TRUE(contains(r.err, kUsage)) << r.err;
}

// The log lies beside the parameter file, also one that is missing; batch mode silences
// only the message.
TEST(CommandLine, MissingParameterFileIsLoggedBesideIt) {
  TempDir dir;
  const CaseRun shown = runCase(dir, {"-debug", "missing.pfs"}, {});
  const CaseRun quiet = runCase(dir, {"missing.pfs"}, {{"buildmode", "NiGtH"}});
  EXPECT_EQ(shown.exitCode, 1);
  EXPECT_EQ(quiet.exitCode, 1);
  EXPECT_TRUE(contains(shown.err, "karnet: Error in parameter file")) << shown.err;
  EXPECT_FALSE(contains(quiet.err, "Error in parameter file")) << quiet.err;
  EXPECT_EQ(shown.log, quiet.log);
  const auto lines = splitLines(quiet.log);
  ASSERT_GE(lines.size(), 2u) << quiet.log;
  EXPECT_TRUE(contains(lines[0], "Can't open")) << quiet.log;
  EXPECT_EQ(lines[1], "Error in parameter file");
  EXPECT_EQ(quiet.log.substr(quiet.log.size() - runTimeBlock("Abnormal").size()),
            runTimeBlock("Abnormal"));
  // The last argument is the parameter file.
  EXPECT_EQ(runCase(dir, {"first.pfs", "second.pfs"}).exitCode, 1);
  EXPECT_TRUE(fileExists(dir.file("second.log")));
  EXPECT_FALSE(fileExists(dir.file("first.log")));
}

TEST(CommandLine, UnwritableLogGoesToStandardError) {
  TempDir dir;
  // A directory with the log's name cannot be opened as the log file.
  std::filesystem::create_directory(dir.file("case.log"));
  const ProcessResult r = runKarnet({"case.pfs"}, dir.path(), kBatch);
  EXPECT_EQ(r.exitCode, 1);
  EXPECT_TRUE(contains(r.err, "Error in parameter file\n")) << r.err;
  EXPECT_TRUE(contains(r.err, "-- Completion code : Abnormal")) << r.err;
}

TEST(CommandLine, HelpAndVersionNeedNoParameterFile) {
  TempDir dir;
  const ProcessResult help = runKarnet({"--help"}, dir.path());
  EXPECT_EQ(help.exitCode, 0);
  for (const char* text : {kUsage.c_str(), "OUTPUT_DATA", "--quiet"}) {
    EXPECT_TRUE(contains(help.out, text)) << text << "\n" << help.out;
  }
  const ProcessResult version = runKarnet({"--version"}, dir.path());
  EXPECT_EQ(version.exitCode, 0);
  EXPECT_TRUE(contains(version.out, "karnet")) << version.out;
  EXPECT_TRUE(listDir(dir.path()).empty());
}

// A 10 x 10 node basin of 100 m cells, 50 m deep, with land (the land value) in its two
// western columns; ten 5 m levels. Observations: three in the water, one on land, one below
// the bed, two outside the grid on either side.
void writeSummaryCase(const TempDir& dir) {
  BathymetrySpec b = localBasin(10, 10, 100.0, -50.0f, 0.0, 0.0);
  for (int j = 0; j < 10; ++j) b.heights[j * 10] = b.heights[j * 10 + 1] = 10.0f;
  writeBathymetry(dir.file("bathymetry.nc"), b);
  writeFile(dir.file("observations.txt"),
            "500 500 -10 5\n500 500 -20 4\n620 580 -30 3\n0 500 -5 6\n600 600 -60 2\n"
            "5000 500 -10 1\n-300 500 -10 1\n");
  ParameterFile p;
  p.zRange = "0, 9";
  p.spacing = "5";
  p.searchRadius = "1000";
  writeFile(dir.file("case.pfs"), p.render());
}

TEST(RunSummary, CountsWhereTheObservationsLie) {
  TempDir dir;
  writeSummaryCase(dir);
  const CaseRun r = runCase(dir);
  ASSERT_EQ(r.exitCode, 0) << r.log;
  // Wet nodes: 80 water columns, each wet at the nine levels above its bed (-45 .. -5 m).
  int shape[3];
  const std::vector<float> v = readResult(dir.file("result.nc"), nullptr, shape);
  ASSERT_EQ(v.size(), 1000u);
  int estimated = 0;
  for (int l = 1; l < 10; ++l) {
    for (int j = 0; j < 10; ++j) {
      for (int i = 2; i < 10; ++i) estimated += v[(l * 10 + j) * 10 + i] != -1e-30f ? 1 : 0;
    }
  }
  ASSERT_GT(estimated, 0);
  EXPECT_TRUE(contains(r.err, "karnet: result: ")) << r.err;
  EXPECT_TRUE(contains(r.err, "result.nc\nkarnet: grid: 10 x 10 x 10 nodes, " +
                                  std::to_string(estimated) +
                                  " of 720 wet nodes estimated\n"
                                  "karnet: observations: 7 read, 3 used (in the water inside the "
                                  "grid), 2 outside the grid, 1 on land, 1 below the bed\n"))
      << r.err;
  EXPECT_FALSE(contains(r.err, "warning")) << r.err;
  // The log is as it always was: no summary in it.
  EXPECT_FALSE(contains(r.log, "karnet:"));
}

TEST(RunSummary, QuietRunSaysNothingButTheErrorThatStopsIt) {
  TempDir dir;
  writeSummaryCase(dir);
  // Anywhere before the parameter file.
  for (const auto& args : std::vector<std::vector<std::string>>{
           {"--quiet", "case.pfs"}, {"-debug", "--QUIET", "case.pfs"}}) {
    const ProcessResult r = runKarnet(args, dir.path(), kBatch);
    EXPECT_EQ(r.exitCode, 0) << args[0];
    EXPECT_EQ(r.err, "") << args[0];
  }
  writeFile(dir.file("observations.txt"), "500 500 -10 5\n500 500 -10\n");
  const ProcessResult bad = runKarnet({"--quiet", "case.pfs"}, dir.path(), kBatch);
  EXPECT_EQ(bad.exitCode, 1);
  EXPECT_TRUE(contains(bad.err, "karnet: observations.txt:2: 4 numbers expected")) << bad.err;
}

}  // namespace
}  // namespace karnet::e2e
