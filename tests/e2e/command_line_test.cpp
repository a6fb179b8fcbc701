// The program's command line, log placement and parameter-file failures, run as a user would.
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

// The echo may give file names as written or resolved against the run directory.
std::string withFileNamesResolved(const std::string& line, const std::string& runDir) {
  for (const std::string key : {"\t\tFileName : ", "\t\tDataFileName : "}) {
    if (line.rfind(key, 0) == 0) {
      std::filesystem::path name = line.substr(key.size());
      if (name.is_relative()) name = std::filesystem::path(runDir) / name;
      return key + name.lexically_normal().string();
    }
  }
  return line;
}

TEST(CommandLine, UsageWhenThereIsNoParameterFile) {
  TempDir dir;
  for (const auto& args : std::vector<std::vector<std::string>>{
           {}, {"case.pfs", "//apv"}, {"case.pfs", "//APV"}, {"case.pfs", "-debug"}}) {
    const ProcessResult r = runKarnet(args, dir.path());
    EXPECT_EQ(r.exitCode, 1);
    EXPECT_NE(r.err.find(kUsage), std::string::npos) << r.err;
    // Nothing was named as parameter file, so no log may appear.
    EXPECT_TRUE(listDir(dir.path()).empty());
  }
}

TEST(CommandLine, BuildmodeNigthSilencesTheMessageOnly) {
  TempDir dir;
  ProcessResult shown = runKarnet({"missing.pfs"}, dir.path());
  const std::string shownLog = readFile(dir.file("missing.log"));
  ProcessResult quiet = runKarnet({"missing.pfs"}, dir.path(), {{"buildmode", "NiGtH"}});
  const std::string quietLog = readFile(dir.file("missing.log"));
  EXPECT_EQ(shown.exitCode, 1);
  EXPECT_EQ(quiet.exitCode, 1);
  EXPECT_NE(shown.err.find("karnet: Error in parameter file"), std::string::npos) << shown.err;
  EXPECT_EQ(quiet.err.find("Error in parameter file"), std::string::npos) << quiet.err;
  EXPECT_EQ(shownLog, quietLog);
}

TEST(CommandLine, MissingParameterFileIsLoggedBesideIt) {
  TempDir dir;
  const ProcessResult r = runKarnet({"-debug", "missing.pfs"}, dir.path(),
                                    {{"buildmode", "nigth"}});
  EXPECT_EQ(r.exitCode, 1);
  const std::string log = readFile(dir.file("missing.log"));
  const auto lines = splitLines(log);
  ASSERT_GE(lines.size(), 2u) << log;
  EXPECT_NE(lines[0].find("Can't open"), std::string::npos) << log;
  EXPECT_EQ(lines[1], "Error in parameter file");
  EXPECT_EQ(log.substr(log.size() - runTimeBlock("Abnormal").size()), runTimeBlock("Abnormal"));
}

TEST(CommandLine, TheLastArgumentIsTheParameterFile) {
  TempDir dir;
  const ProcessResult r = runKarnet({"first.pfs", "second.pfs"}, dir.path(),
                                    {{"buildmode", "nigth"}});
  EXPECT_EQ(r.exitCode, 1);
  EXPECT_TRUE(fileExists(dir.file("second.log")));
  EXPECT_FALSE(fileExists(dir.file("first.log")));
}

TEST(CommandLine, UnwritableLogGoesToStandardError) {
  TempDir dir;
  // A directory with the log's name cannot be opened as the log file.
  std::filesystem::create_directory(dir.file("case.log"));
  const ProcessResult r = runKarnet({"case.pfs"}, dir.path(), {{"buildmode", "nigth"}});
  EXPECT_EQ(r.exitCode, 1);
  EXPECT_NE(r.err.find("Error in parameter file\n"), std::string::npos) << r.err;
  EXPECT_NE(r.err.find("-- Completion code : Abnormal"), std::string::npos) << r.err;
}

TEST(CommandLine, HelpAndVersionNeedNoParameterFile) {
  TempDir dir;
  const ProcessResult help = runKarnet({"--help"}, dir.path());
  EXPECT_EQ(help.exitCode, 0);
  EXPECT_NE(help.out.find(kUsage), std::string::npos) << help.out;
  EXPECT_NE(help.out.find("OUTPUT_DATA"), std::string::npos) << help.out;
  const ProcessResult version = runKarnet({"--version"}, dir.path());
  EXPECT_EQ(version.exitCode, 0);
  EXPECT_NE(version.out.find("karnet"), std::string::npos) << version.out;
  EXPECT_TRUE(listDir(dir.path()).empty());
}

TEST(ParameterFile, MissingSectionLeavesTheEchoOfTheSectionsBefore) {
  TempDir dir;
  ParameterFile p;
  p.omit = {"OUTPUT_DATA"};
  writeFile(dir.file("case.pfs"), p.render());
  const ProcessResult r = runKarnet({"case.pfs"}, dir.path(), {{"buildmode", "nigth"}});
  EXPECT_EQ(r.exitCode, 1);
  const std::string log = readFile(dir.file("case.log"));
  const std::vector<std::string> echo = {
      "======================================================================",
      "TARGET: Q4_DIGITIZING_OF_DATA",
      "\tsection: INPUT_FILES ---------------------------------",
      "\t\tFileName : bathymetry.nc",
      "\t\tDataFileName : observations.txt",
      "\t\tProjection: UTM-32",
      "\tsection : DESCRIPTION_OF_GRID ------------------------",
      "\t\tZRange : 0, 11",
      "\t\tSpacing : 2.500000",
      "\tsection : CALCULATION_PARAMETERS ---------------------",
      "\t\tSearchRadius: 2500.000000",
      "\t\tMaxExtrapolationDistance : 5.000000, 10.000000",
      "\t\tAnalysis : bilinear",
      "\tsection : OBJECTIVE_ANALYSIS_PARAMETERS --------------",
      "\t\tZeroCrossingDistance: 2500.000000",
      "\t\tDecayDistance : 1200.000000",
      "\t\tErrorVariance : 10.000000",
      "\t\tMinData : -5.000000",
      "\t\tMaxData : 40.000000",
      "\t\tFilterOperations : 1",
      "\t\tCorrelationSampleSize : 8",
      "\t\tFilterType : 12 pts filter "};
  const auto lines = splitLines(log);
  ASSERT_GE(lines.size(), echo.size() + 2) << log;
  for (std::size_t i = 0; i < echo.size(); ++i) {
    EXPECT_EQ(withFileNamesResolved(lines[i], dir.path()), withFileNamesResolved(echo[i], dir.path()))
        << "line " << i + 1;
  }
  const std::vector<std::string> rest(lines.begin() + echo.size(), lines.end());
  EXPECT_NE(rest[0].find("OUTPUT_DATA"), std::string::npos) << rest[0];
  EXPECT_EQ(rest[1], "Error in parameter file");
  EXPECT_EQ(log.substr(log.size() - runTimeBlock("Abnormal").size()), runTimeBlock("Abnormal"));
}

}  // namespace
}  // namespace karnet::e2e
