// One run over the ranks of an MPI job gives what the plain run gives: the
// same exit code, messages, log and result bytes.
#include <gtest/gtest.h>

#include <map>
#include <string>
#include <vector>

#include "e2e/e2e_support.h"

namespace karnet::e2e {
namespace {

const std::map<std::string, std::string> kEnvironment = {
    {"SOURCE_DATE_EPOCH", "1700000000"},
    // Several ranks on one machine, also as root (as in a container).
    {"OMPI_MCA_rmaps_base_oversubscribe", "1"},
    {"OMPI_ALLOW_RUN_AS_ROOT", "1"},
    {"OMPI_ALLOW_RUN_AS_ROOT_CONFIRM", "1"},
};

struct Outcome {
  ProcessResult process;
  std::string log;     // without the CPU time, which differs from run to run
  std::string result;  // the result file's bytes, empty when there is none
  std::string karnetLines;  // the lines karnet wrote to stderr
};

std::string withoutLines(const std::string& text, const std::string& marker,
                         bool keepMatching) {
  std::string kept;
  for (const std::string& line : splitLines(text)) {
    if ((line.find(marker) != std::string::npos) == keepMatching) kept += line + "\n";
  }
  return kept;
}

Outcome runCase(const ParameterFile& parameters, int ranks) {
  TempDir dir;
  writeSmallCase(dir, parameters);
  Outcome o;
  if (ranks == 0) {
    o.process = runKarnet({"case.pfs"}, dir.path(), kEnvironment);
  } else {
    o.process = runProgram(KARNET_MPIEXEC, {"-np", std::to_string(ranks), KARNET_BINARY, "case.pfs"},
                           dir.path(), kEnvironment);
  }
  o.log = withoutLines(readFile(dir.file("case.log")), "CPU time", false);
  o.result = readFile(dir.file("result.nc"));
  // mpirun adds notes of its own when a rank ends with an error.
  for (const std::string& line : splitLines(o.process.err)) {
    if (line.rfind("karnet", 0) == 0) o.karnetLines += line + "\n";
  }
  return o;
}

class MpiRun : public testing::Test {
 protected:
  void SetUp() override {
    if (std::string(KARNET_MPIEXEC).empty() || !fileExists(KARNET_MPIEXEC)) {
      GTEST_SKIP() << "no MPI launcher in this build";
    }
  }

  // Runs plainly and over 2 and 3 ranks; the outcomes must agree.
  void expectSameAsPlain(const ParameterFile& parameters, int exitCode) {
    const Outcome plain = runCase(parameters, 0);
    ASSERT_EQ(plain.process.exitCode, exitCode) << plain.process.err;
    if (exitCode == 0) {
      ASSERT_GT(plain.result.size(), 1000u);
    } else {
      EXPECT_TRUE(plain.result.empty());
    }
    for (int ranks : {2, 3}) {
      SCOPED_TRACE(testing::Message() << ranks << " ranks");
      const Outcome shared = runCase(parameters, ranks);
      EXPECT_EQ(shared.process.exitCode, plain.process.exitCode) << shared.process.err;
      EXPECT_EQ(shared.karnetLines, plain.karnetLines);
      EXPECT_EQ(shared.log, plain.log);
      EXPECT_TRUE(shared.result == plain.result) << "result files differ";
    }
  }
};

TEST_F(MpiRun, BilinearRunGivesThePlainRunsBytes) {
  ParameterFile p;
  p.projection = "'LOCAL'";
  p.filterOperations = "2";
  expectSameAsPlain(p, 0);
}

TEST_F(MpiRun, ObjectiveAnalysisFromALevelAboveTheFirst) {
  ParameterFile p;
  p.projection = "'LOCAL'";
  p.analysis = "objective";
  p.zRange = "3, 11";
  p.filterType = "'shapiro'";
  expectSameAsPlain(p, 0);
}

TEST_F(MpiRun, ResultThatCannotBeWrittenEndsEveryRankWithoutAFile) {
  ParameterFile p;
  p.projection = "'LOCAL'";
  p.outputFileName = "|no such folder/result.nc|";
  expectSameAsPlain(p, 1);
}

TEST_F(MpiRun, InvalidSettingsEndEveryRankWithTheSameMessage) {
  ParameterFile p;
  p.projection = "'LOCAL'";
  p.spacing = "0";
  expectSameAsPlain(p, 1);
}

}  // namespace
}  // namespace karnet::e2e
