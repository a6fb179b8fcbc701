// The objective analysis' error field in the result file, and the
// cross-validation modes, run as users run them.
#include <gtest/gtest.h>

#include <cmath>
#include <sstream>

#include "e2e/e2e_support.h"

namespace karnet::e2e {
namespace {

constexpr float kFill = -1e-30f;

ParameterFile objectiveCase() {
  ParameterFile p;
  p.analysis = "'objective'";
  return p;
}

TEST(ErrorField, ObjectiveAnalysisWritesItBesideTheItem) {
  TempDir dir;
  writeSmallCase(dir, objectiveCase());
  const CaseRun run = runCase(dir);
  ASSERT_EQ(run.exitCode, 0) << run.err << run.log;

  const ProcessResult header = runProgram("/usr/bin/ncdump", {"-h", "result.nc"}, dir.path());
  ASSERT_EQ(header.exitCode, 0) << header.err;
  for (const char* line :
       {"float Temperature_error(time, z, y, x) ;",
        "Temperature:ancillary_variables = \"Temperature_error\" ;",
        "Temperature_error:_FillValue = -1.e-30f ;", "Temperature_error:units = \"1\" ;",
        "Temperature_error:long_name = \"relative error variance of the Temperature estimate\" ;"}) {
    EXPECT_NE(header.out.find(line), std::string::npos) << line << "\n" << header.out;
  }
  EXPECT_EQ(header.out.find("Temperature_error:standard_name"), std::string::npos);

  const std::vector<double> values = readVariable(dir.file("result.nc"), "Temperature");
  const std::vector<double> errors = readVariable(dir.file("result.nc"), "Temperature_error");
  ASSERT_EQ(errors.size(), values.size());
  std::size_t estimated = 0;
  for (std::size_t i = 0; i < values.size(); ++i) {
    // Every node with a value got it from an estimate here (each data node
    // lies within the search radius of itself), and only those have an error.
    EXPECT_EQ(values[i] == kFill, errors[i] == kFill) << i;
    if (errors[i] == kFill) continue;
    ++estimated;
    EXPECT_GE(errors[i], 0.0);
    EXPECT_LE(errors[i], 1.0);
  }
  EXPECT_GT(estimated, values.size() / 3);

  // A bilinear run has no error field.
  writeFile(dir.file("bilinear.pfs"), ParameterFile{}.render());
  ASSERT_EQ(runCase(dir, {"bilinear.pfs"}).exitCode, 0);
  EXPECT_TRUE(readVariable(dir.file("result.nc"), "Temperature_error").empty());
}

// The rows of a CSV file, fields split.
std::vector<std::vector<std::string>> readCsv(const std::string& path) {
  std::vector<std::vector<std::string>> rows;
  for (const std::string& line : splitLines(readFile(path))) {
    std::vector<std::string> fields;
    std::stringstream stream(line);
    std::string field;
    while (std::getline(stream, field, ',')) fields.push_back(field);
    if (!line.empty() && line.back() == ',') fields.emplace_back();
    rows.push_back(fields);
  }
  return rows;
}

TEST(CrossValidation, LeavesEachCastOutAndWritesTheTableInsteadOfAResult) {
  TempDir dir;
  ParameterFile p = objectiveCase();
  // One cell per estimate: each cast is estimated from its nearest neighbour
  // along x, 1250 m off, whose values differ by 0.001 per metre.
  p.correlationSampleSize = "1";
  writeSmallCase(dir, p);
  const CaseRun run = runCase(dir, {"--cross-validate", "case.pfs"});
  ASSERT_EQ(run.exitCode, 0) << run.err << run.log;
  EXPECT_NE(run.out.find("Cross-validation: 20 casts left out one at a time\n"), std::string::npos)
      << run.out;
  EXPECT_NE(run.out.find("Table written to "), std::string::npos);
  EXPECT_FALSE(fileExists(dir.file("result.nc")));

  const auto rows = readCsv(dir.file("case_cv.csv"));
  ASSERT_GE(rows.size(), 3u);
  EXPECT_EQ(rows.front(),
            (std::vector<std::string>{"level", "depth_m", "nodes", "missed", "rms", "bias"}));
  const auto& top = rows[rows.size() - 2];
  EXPECT_EQ(top[0], "11");
  EXPECT_EQ(top[1], "2.5");
  EXPECT_EQ(top[2], "20");
  EXPECT_NEAR(std::stod(top[4]), 1.25, 1e-3);
  EXPECT_EQ(rows.back()[0], "all");

  EXPECT_TRUE(contains(run.log, "Cross-validation: 20 casts")) << run.log;
  EXPECT_TRUE(contains(run.log, "-- Completion code : Successful")) << run.log;
}

TEST(CrossValidation, SweepTriesEveryCombinationAndMarksTheBest) {
  TempDir dir;
  writeSmallCase(dir, objectiveCase());
  const CaseRun run =
      runCase(dir, {"--sweep", "DecayDistance=600,1200,2400", "ErrorVariance=1,50", "case.pfs"});
  ASSERT_EQ(run.exitCode, 0) << run.err << run.log;
  EXPECT_NE(run.out.find("Cross-validation sweep: 6 combinations"), std::string::npos) << run.out;
  EXPECT_NE(run.out.find("<- best"), std::string::npos) << run.out;
  EXPECT_FALSE(fileExists(dir.file("result.nc")));

  const auto rows = readCsv(dir.file("case_sweep.csv"));
  ASSERT_EQ(rows.size(), 7u);
  EXPECT_EQ(rows[0], (std::vector<std::string>{"DecayDistance", "ErrorVariance", "nodes",
                                                "missed", "rms", "bias", "best"}));
  int marked = 0;
  double bestRms = 1e300, markedRms = 0;
  std::vector<std::string> rmsValues;
  for (std::size_t r = 1; r < rows.size(); ++r) {
    ASSERT_EQ(rows[r].size(), 7u);
    const double rms = std::stod(rows[r][4]);
    bestRms = std::min(bestRms, rms);
    rmsValues.push_back(rows[r][4]);
    if (rows[r][6] == "*") {
      ++marked;
      markedRms = rms;
    }
  }
  EXPECT_EQ(rows[1][0], "600");
  EXPECT_EQ(rows[2][1], "50");
  EXPECT_EQ(marked, 1);
  EXPECT_EQ(markedRms, bestRms);
  // The settings matter.
  EXPECT_NE(rmsValues.front(), rmsValues.back());
}

TEST(CrossValidation, RequestsItCannotServeEndWithAnError) {
  TempDir dir;
  writeSmallCase(dir, ParameterFile{});  // bilinear
  const CaseRun bilinear = runCase(dir, {"--cross-validate", "case.pfs"}, {});
  EXPECT_EQ(bilinear.exitCode, 1);
  EXPECT_TRUE(contains(bilinear.err, "needs objective analysis")) << bilinear.err;
  EXPECT_TRUE(contains(bilinear.log, "-- Completion code : Abnormal"));
  EXPECT_FALSE(fileExists(dir.file("case_cv.csv")));

  const CaseRun badSweep = runCase(dir, {"--sweep", "FilterOperations=1,2", "case.pfs"});
  EXPECT_EQ(badSweep.exitCode, 1);
  EXPECT_NE(badSweep.err.find("FilterOperations does not change"), std::string::npos)
      << badSweep.err;
  EXPECT_FALSE(fileExists(dir.file("case_sweep.csv")));
}

}  // namespace
}  // namespace karnet::e2e
