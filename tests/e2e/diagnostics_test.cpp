// The objective analysis' error field in the result file, and the
// cross-validation modes, run as users run them.
#include <gtest/gtest.h>
#include <netcdf.h>

#include <cmath>
#include <sstream>

#include "e2e/e2e_support.h"

namespace karnet::e2e {
namespace {

constexpr float kFill = -1e-30f;

// The values of a (time, z, y, x) variable; shape gets (nz, ny, nx). Empty
// when the file has no such variable.
std::vector<float> readVariable(const std::string& path, const char* name, int shape[3]) {
  int nc = 0;
  std::vector<float> values;
  if (nc_open(path.c_str(), NC_NOWRITE, &nc) != NC_NOERR) return values;
  int varid = 0;
  int dims[4];
  if (nc_inq_varid(nc, name, &varid) == NC_NOERR && nc_inq_vardimid(nc, varid, dims) == NC_NOERR) {
    std::size_t count = 1;
    for (int d = 1; d < 4; ++d) {
      std::size_t length = 0;
      nc_inq_dimlen(nc, dims[d], &length);
      shape[d - 1] = static_cast<int>(length);
      count *= length;
    }
    values.resize(count);
    if (nc_get_var_float(nc, varid, values.data()) != NC_NOERR) values.clear();
  }
  nc_close(nc);
  return values;
}

ParameterFile objectiveCase() {
  ParameterFile p;
  p.projection = "'LOCAL'";
  p.analysis = "'objective'";
  return p;
}

TEST(ErrorField, ObjectiveAnalysisWritesItBesideTheItem) {
  TempDir dir;
  writeSmallCase(dir, objectiveCase());
  const ProcessResult run = runKarnet({"case.pfs"}, dir.path(), {{"buildmode", "nigth"}});
  ASSERT_EQ(run.exitCode, 0) << run.err << readFile(dir.file("case.log"));

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

  int shape[3] = {0, 0, 0};
  int errorShape[3] = {0, 0, 0};
  const std::vector<float> values = readVariable(dir.file("result.nc"), "Temperature", shape);
  const std::vector<float> errors =
      readVariable(dir.file("result.nc"), "Temperature_error", errorShape);
  ASSERT_EQ(errors.size(), values.size());
  ASSERT_EQ(errorShape[0], shape[0]);
  std::size_t estimated = 0;
  for (std::size_t i = 0; i < values.size(); ++i) {
    // Every node with a value got it from an estimate here (each data node
    // lies within the search radius of itself), and only those have an error.
    EXPECT_EQ(values[i] == kFill, errors[i] == kFill) << i;
    if (errors[i] == kFill) continue;
    ++estimated;
    EXPECT_GE(errors[i], 0.0f);
    EXPECT_LE(errors[i], 1.0f);
  }
  EXPECT_GT(estimated, values.size() / 3);

  // A bilinear run has no error field.
  ParameterFile bilinear;
  bilinear.projection = "'LOCAL'";
  writeFile(dir.file("bilinear.pfs"), bilinear.render());
  ASSERT_EQ(runKarnet({"bilinear.pfs"}, dir.path(), {{"buildmode", "nigth"}}).exitCode, 0);
  EXPECT_TRUE(readVariable(dir.file("result.nc"), "Temperature_error", shape).empty());
}

TEST(ErrorField, RisesTowardsOneAwayFromTheData) {
  TempDir dir;
  ParameterFile p = objectiveCase();
  p.searchRadius = "10000";
  writeSmallCase(dir, p);
  // Casts only in the west: x nodes 1 and 3, rows 4 and 8.
  std::ostringstream obs;
  for (int j : {4, 8}) {
    for (int i : {1, 3}) {
      for (double z = -0.5; z > -12.0; z -= 1.5) {
        obs << 1000.0 + i * 250.0 << ' ' << 2000.0 + j * 250.0 << ' ' << z << ' '
            << 8.0 + 0.4 * z << '\n';
      }
    }
  }
  writeFile(dir.file("observations.txt"), obs.str());
  ASSERT_EQ(runKarnet({"case.pfs"}, dir.path(), {{"buildmode", "nigth"}}).exitCode, 0);
  int shape[3] = {0, 0, 0};
  const std::vector<float> errors =
      readVariable(dir.file("result.nc"), "Temperature_error", shape);
  ASSERT_FALSE(errors.empty());
  // Along row 6 of the top level, from between the casts towards the east.
  const int nx = shape[2];
  const float* row = errors.data() + (static_cast<std::size_t>(shape[0] - 1) * shape[1] + 6) * nx;
  EXPECT_LT(row[2], 0.2f);
  for (int i = 3; i < 20; ++i) EXPECT_GE(row[i], row[i - 1]) << "node " << i;
  EXPECT_GT(row[8], 2.0f * row[2]);
  EXPECT_EQ(row[20], 1.0f);
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
  const ProcessResult run =
      runKarnet({"--cross-validate", "case.pfs"}, dir.path(), {{"buildmode", "nigth"}});
  ASSERT_EQ(run.exitCode, 0) << run.err << readFile(dir.file("case.log"));
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

  const std::string log = readFile(dir.file("case.log"));
  EXPECT_NE(log.find("Cross-validation: 20 casts"), std::string::npos) << log;
  EXPECT_NE(log.find("-- Completion code : Successful"), std::string::npos) << log;
}

TEST(CrossValidation, SweepTriesEveryCombinationAndMarksTheBest) {
  TempDir dir;
  writeSmallCase(dir, objectiveCase());
  const ProcessResult run =
      runKarnet({"--sweep", "DecayDistance=600,1200,2400", "ErrorVariance=1,50", "case.pfs"},
                dir.path(), {{"buildmode", "nigth"}});
  ASSERT_EQ(run.exitCode, 0) << run.err << readFile(dir.file("case.log"));
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
  ParameterFile p;  // bilinear
  p.projection = "'LOCAL'";
  writeSmallCase(dir, p);
  const ProcessResult bilinear = runKarnet({"--cross-validate", "case.pfs"}, dir.path());
  EXPECT_EQ(bilinear.exitCode, 1);
  EXPECT_NE(bilinear.err.find("needs objective analysis"), std::string::npos) << bilinear.err;
  EXPECT_NE(readFile(dir.file("case.log")).find("-- Completion code : Abnormal"),
            std::string::npos);
  EXPECT_FALSE(fileExists(dir.file("case_cv.csv")));

  const ProcessResult badSweep = runKarnet({"--sweep", "FilterOperations=1,2", "case.pfs"},
                                           dir.path(), {{"buildmode", "nigth"}});
  EXPECT_EQ(badSweep.exitCode, 1);
  EXPECT_NE(badSweep.err.find("FilterOperations does not change"), std::string::npos)
      << badSweep.err;
  EXPECT_FALSE(fileExists(dir.file("case_sweep.csv")));
}

}  // namespace
}  // namespace karnet::e2e
