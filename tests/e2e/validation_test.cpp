// Settings that cannot give a sound run are refused before any computing, each with its message.
#include <gtest/gtest.h>

#include <filesystem>
#include <functional>

#include "e2e/e2e_support.h"

namespace karnet::e2e {
namespace {

// The log lines after the echo's closing frame.
std::vector<std::string> linesAfterEcho(const std::string& log) {
  const auto lines = splitLines(log);
  const std::string frame(70, '=');
  std::size_t frames = 0;
  for (std::size_t i = 0; i < lines.size(); ++i) {
    if (lines[i] == frame && ++frames == 2) {
      return std::vector<std::string>(lines.begin() + i + 1, lines.end());
    }
  }
  return {};
}

struct Refusal {
  const char* name;
  std::function<void(ParameterFile&)> change;
  std::function<void(const TempDir&)> afterwards;  // may spoil the inputs
  std::string message;
};

TEST(Validation, EachRefusalHasItsMessageAndExitCode1) {
  const std::vector<Refusal> refusals = {
      {"missing observations", {},
       [](const TempDir& d) { std::filesystem::remove(d.file("observations.txt")); },
       "ERROR: in input file selection"},
      {"unreadable bathymetry", [](ParameterFile& p) { p.fileName = "|nowhere.nc|"; }, {},
       "ERROR: in input file selection"},
      {"bathymetry that is not a gridded file", {},
       [](const TempDir& d) { writeFile(d.file("bathymetry.nc"), "not a grid\n"); },
       "dx = -0.000000 dy = -0.000000"},
      {"reversed level range", [](ParameterFile& p) { p.zRange = "9, 3"; }, {},
       "l0 = 9 lx = 3"},
      {"zero level spacing", [](ParameterFile& p) { p.spacing = "0"; }, {}, "dz = 0.000000"},
      {"negative level spacing", [](ParameterFile& p) { p.spacing = "-2"; }, {},
       "dz = -2.000000"},
      {"negative search radius", [](ParameterFile& p) { p.searchRadius = "-1"; }, {},
       "ERROR: in calculation parameters"},
      {"negative extrapolation", [](ParameterFile& p) { p.maxExtrapolationDistance = "1, -1"; },
       {}, "ERROR: in calculation parameters"},
      {"error variance above 100", [](ParameterFile& p) { p.errorVariance = "100.5"; }, {},
       "ERROR: in calculation parameters"},
      {"no correlation samples", [](ParameterFile& p) { p.correlationSampleSize = "0"; }, {},
       "ERROR: in calculation parameters"},
      {"zero decay with objective analysis",
       [](ParameterFile& p) {
         p.analysis = "objective";
         p.decayDistance = "0";
       },
       {}, "ERROR: in calculation parameters"},
      {"zero crossing 0 with objective analysis",
       [](ParameterFile& p) {
         p.analysis = "objective";
         p.zeroCrossingDistance = "0";
       },
       {}, "ERROR: in calculation parameters"},
      {"unknown projection", [](ParameterFile& p) { p.projection = "'MERCATOR-ON-MARS'"; }, {},
       "Unable to initialize geo. system"},
  };
  for (const Refusal& refusal : refusals) {
    SCOPED_TRACE(refusal.name);
    TempDir dir;
    ParameterFile p;
    p.projection = "'LOCAL'";
    if (refusal.change) refusal.change(p);
    writeSmallCase(dir, p);
    if (refusal.afterwards) refusal.afterwards(dir);
    const ProcessResult r = runKarnet({"case.pfs"}, dir.path(), {{"buildmode", "nigth"}});
    EXPECT_EQ(r.exitCode, 1);
    const auto after = linesAfterEcho(readFile(dir.file("case.log")));
    ASSERT_GE(after.size(), 2u);
    EXPECT_EQ(after[0], refusal.message);
    EXPECT_EQ(after[after.size() - 3], "-- Completion code : Abnormal");
    EXPECT_FALSE(fileExists(dir.file("result.nc")));
  }
}

TEST(Validation, ZeroDecayIsAcceptedForBilinearRuns) {
  TempDir dir;
  ParameterFile p;
  p.projection = "'LOCAL'";
  p.decayDistance = "0";
  p.zeroCrossingDistance = "0";
  writeSmallCase(dir, p);
  const ProcessResult r = runKarnet({"case.pfs"}, dir.path(), {{"buildmode", "nigth"}});
  EXPECT_EQ(r.exitCode, 0) << readFile(dir.file("case.log"));
  EXPECT_TRUE(fileExists(dir.file("result.nc")));
}

TEST(Validation, ZeroNodeDistanceIsRefused) {
  TempDir dir;
  ParameterFile p;
  p.projection = "'LOCAL'";
  writeSmallCase(dir, p);
  BathymetrySpec flat;
  // A single node: neither axis has a spacing.
  flat.nx = 1;
  flat.ny = 1;
  flat.spacing = 0.0;
  flat.projection = "LOCAL";
  flat.heights.assign(1, -10.0f);
  writeBathymetry(dir.file("bathymetry.nc"), flat);
  const ProcessResult r = runKarnet({"case.pfs"}, dir.path(), {{"buildmode", "nigth"}});
  EXPECT_EQ(r.exitCode, 1);
  const auto after = linesAfterEcho(readFile(dir.file("case.log")));
  ASSERT_FALSE(after.empty());
  EXPECT_EQ(after[0], "dx = 0.000000 dy = 0.000000");
}

// The small LOCAL case with its observation file rewritten line by line: edit(i, line)
// gives the text that stands for line i (line ends included).
void writeEditedCase(const TempDir& dir,
                     const std::function<std::string(std::size_t, const std::string&)>& edit) {
  ParameterFile p;
  p.projection = "'LOCAL'";
  const auto lines = splitLines(writeSmallCase(dir, p));
  std::string text;
  for (std::size_t i = 0; i < lines.size(); ++i) text += edit(i, lines[i]);
  writeFile(dir.file("observations.txt"), text);
}

// The observation file is checked line by line while it is scanned.
TEST(Validation, BadObservationLinesStopTheRunWithTheirLineNumber) {
  const std::vector<std::pair<std::string, std::string>> spoilers = {
      {"blank line", "\n"},
      {"three numbers", "1500 3000 -2\n"},
      {"not a number", "1500 3000 -2 nan\n"},
      {"infinite", "1500 inf -2 4\n"},
      {"text", "station 7 follows\n"},
  };
  for (const auto& [name, spoiler] : spoilers) {
    SCOPED_TRACE(name);
    TempDir dir;
    writeEditedCase(dir, [&spoiler](std::size_t i, const std::string& line) {
      return (i == 6 ? spoiler : std::string()) + line + "\n";
    });
    const ProcessResult r = runKarnet({"case.pfs"}, dir.path(), {{"buildmode", "nigth"}});
    EXPECT_EQ(r.exitCode, 1);
    const std::string log = readFile(dir.file("case.log"));
    EXPECT_NE(log.find("\nERROR while reading water file\n      line number: 7\n"),
              std::string::npos)
        << log;
    EXPECT_FALSE(fileExists(dir.file("result.nc")));
  }
}

TEST(Validation, LongLinesAndAMissingFinalLineFeedAreRead) {
  TempDir dir;
  const std::size_t last = splitLines(writeSmallCase(dir, ParameterFile{})).size() - 1;
  writeEditedCase(dir, [last](std::size_t i, const std::string& line) {
    std::string text = line;
    // Trailing text is ignored, however long the line gets.
    if (i == 3) text.append(3, ' ').append(200, '#');
    // CR LF line ends, and none after the last line.
    if (i < last) text += "\r\n";
    return text;
  });
  const ProcessResult r = runKarnet({"case.pfs"}, dir.path(), {{"buildmode", "nigth"}});
  const std::string log = readFile(dir.file("case.log"));
  EXPECT_EQ(r.exitCode, 0) << log;
  // Every line, the last one included, reached the gridding.
  EXPECT_EQ(log.find("ERROR"), std::string::npos) << log;
  EXPECT_NE(log.find("No. of no interpolations"), std::string::npos) << log;
}

TEST(Validation, AnObservationFarAwayMakesTheBasicGridTooLarge) {
  TempDir dir;
  ParameterFile p;
  p.projection = "'LOCAL'";
  const std::string obs = writeSmallCase(dir, p);
  writeFile(dir.file("observations.txt"), obs + "1e12 2500 -3 7\n");
  const ProcessResult r = runKarnet({"case.pfs"}, dir.path(), {{"buildmode", "nigth"}});
  EXPECT_EQ(r.exitCode, 1);
  const std::string log = readFile(dir.file("case.log"));
  EXPECT_NE(log.find("\nERROR: basic grid too large\n"), std::string::npos) << log;
  EXPECT_NE(log.find("-- Completion code : Abnormal"), std::string::npos) << log;
}

}  // namespace
}  // namespace karnet::e2e
