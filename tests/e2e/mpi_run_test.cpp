// One run over the ranks of an MPI job gives what the plain run gives: the
// same exit code, messages, log and result bytes.
#include <gtest/gtest.h>
#include <signal.h>

#include <filesystem>
#include <functional>
#include <map>
#include <sstream>
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

Outcome runOver(const ParameterFile& parameters, int ranks) {
  TempDir dir;
  writeSmallCase(dir, parameters);
  Outcome o;
  if (ranks == 0) {
    o.process = runKarnet({"case.pfs"}, dir.path(), kEnvironment);
  } else {
    o.process = runProgram(KARNET_MPIEXEC, {"-np", std::to_string(ranks), KARNET_BINARY, "case.pfs"},
                           dir.path(), kEnvironment);
  }
  o.log = withoutCpuTime(readFile(dir.file("case.log")));
  o.result = readFile(dir.file("result.nc"));
  // mpirun adds notes of its own when a rank ends with an error.
  o.karnetLines = linesStartingWith(o.process.err, "karnet");
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
    const Outcome plain = runOver(parameters, 0);
    ASSERT_EQ(plain.process.exitCode, exitCode) << plain.process.err;
    if (exitCode == 0) {
      ASSERT_GT(plain.result.size(), 1000u);
    } else {
      EXPECT_TRUE(plain.result.empty());
    }
    for (int ranks : {2, 3}) {
      SCOPED_TRACE(testing::Message() << ranks << " ranks");
      const Outcome shared = runOver(parameters, ranks);
      EXPECT_EQ(shared.process.exitCode, plain.process.exitCode) << shared.process.err;
      EXPECT_EQ(shared.karnetLines, plain.karnetLines);
      EXPECT_EQ(shared.log, plain.log);
      EXPECT_TRUE(shared.result == plain.result) << "result files differ";
    }
  }
};

// Runs that complete, and runs that every rank ends with the same error.
TEST_F(MpiRun, GivesThePlainRunsExitCodeMessagesLogAndBytes) {
  const struct {
    const char* name;
    std::function<void(ParameterFile&)> edit;
    int exitCode;
  } cases[] = {
      {"bilinear", [](ParameterFile& p) { p.filterOperations = "2"; }, 0},
      {"objective analysis from a level above the first",
       [](ParameterFile& p) {
         p.analysis = "objective";
         p.zRange = "3, 11";
         p.filterType = "'shapiro'";
       },
       0},
      {"result that cannot be written",
       [](ParameterFile& p) { p.outputFileName = "|no such folder/result.nc|"; }, 1},
      {"invalid settings", [](ParameterFile& p) { p.spacing = "0"; }, 1},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    ParameterFile p;
    c.edit(p);
    expectSameAsPlain(p, c.exitCode);
  }
}

TEST_F(MpiRun, CrossValidationIsRefusedOverSeveralRanks) {
  TempDir dir;
  ParameterFile p;
  p.analysis = "objective";
  writeSmallCase(dir, p);
  const ProcessResult run = runProgram(
      KARNET_MPIEXEC, {"-np", "2", KARNET_BINARY, "--cross-validate", "case.pfs"}, dir.path(),
      kEnvironment);
  EXPECT_EQ(run.exitCode, 1);
  EXPECT_NE(run.err.find("karnet: ERROR: cross-validation runs in one process"), std::string::npos)
      << run.err;
  EXPECT_NE(readFile(dir.file("case.log")).find("cross-validation runs in one process"),
            std::string::npos);
}

// The process of rank `rank` of the job working in dir, or 0.
int rankIn(const std::string& dir, int rank) {
  const std::string mark = "OMPI_COMM_WORLD_RANK=" + std::to_string(rank);
  std::error_code ignored;
  for (const auto& entry : std::filesystem::directory_iterator("/proc", ignored)) {
    const std::string name = entry.path().filename().string();
    if (name.find_first_not_of("0123456789") != std::string::npos) continue;
    if (std::filesystem::read_symlink(entry.path() / "cwd", ignored) != dir) continue;
    const std::string environment = readFile(entry.path().string() + "/environ");
    if (environment.find('\0' + mark + '\0') != std::string::npos ||
        environment.rfind(mark + '\0', 0) == 0) {
      return std::stoi(name);
    }
  }
  return 0;
}

// A basin large enough to be interrupted while its levels are analysed.
void writeSlowCase(const TempDir& dir) {
  const BathymetrySpec b = localBasin(300, 300, 100.0, -61.0f, 0.0, 0.0);
  writeBathymetry(dir.file("bathymetry.nc"), b);
  std::ostringstream obs;
  for (int j = 5; j < b.ny; j += 10) {
    for (int i = 5; i < b.nx; i += 10) {
      for (double z = -0.5; z > -60.0; z -= 1.5) obs << i * 100 << ' ' << j * 100 << ' ' << z << ' ' << 8.0 + 0.1 * z << '\n';
    }
  }
  writeFile(dir.file("observations.txt"), obs.str());
  ParameterFile p;
  p.analysis = "objective";
  p.zRange = "0, 39";
  p.spacing = "1.5";
  p.correlationSampleSize = "30";
  writeFile(dir.file("case.pfs"), p.render());
}

// Once the levels are being analysed, sends the signal to one rank alone.
std::function<bool(int)> signalRankOnceAnalysing(const TempDir& dir, int rank, int number,
                                                 bool& signalled) {
  return [&dir, rank, number, &signalled](int) {
    if (readFile(dir.file("case.log")).find("Basic grid parameters") == std::string::npos) {
      return false;
    }
    const int process = rankIn(dir.path(), rank);
    if (process != 0) signalled = kill(process, number) == 0;
    return signalled;
  };
}

TEST_F(MpiRun, CancelOnRankZeroEndsEveryRank) {
  TempDir dir;
  writeSlowCase(dir);
  bool signalled = false;
  // Rank 0 alone is asked to cancel.
  const ProcessResult run =
      runProgram(KARNET_MPIEXEC, {"-np", "2", KARNET_BINARY, "//apv", "case.pfs"}, dir.path(),
                 kEnvironment, signalRankOnceAnalysing(dir, 0, SIGUSR1, signalled));
  ASSERT_TRUE(signalled);
  // Every rank ended as rank 0 did and left the job: mpirun reports 0 only then.
  EXPECT_EQ(run.exitCode, 0) << run.err;
  EXPECT_FALSE(fileExists(dir.file("result.nc")));
  const std::string log = readFile(dir.file("case.log"));
  EXPECT_EQ(log.find("Statistics for local grid"), std::string::npos);
  EXPECT_NE(log.find("Completion code : Successful"), std::string::npos);
}

// An interrupt sent to one rank other than 0 ends every rank as it ends a plain
// run: rank 0 logs the signal's message and the abnormal end, every process
// exits with the signal's number, and no result file appears.
TEST_F(MpiRun, SignalToOneRankEndsEveryRankWithItsMessageAndCode) {
  TempDir dir;
  writeSlowCase(dir);
  bool signalled = false;
  const ProcessResult run =
      runProgram(KARNET_MPIEXEC, {"-np", "3", KARNET_BINARY, "case.pfs"}, dir.path(),
                 kEnvironment, signalRankOnceAnalysing(dir, 2, SIGTERM, signalled));
  ASSERT_TRUE(signalled);
  EXPECT_EQ(run.exitCode, SIGTERM) << run.err;
  EXPECT_NE(run.err.find("karnet: Termination reques"), std::string::npos) << run.err;
  EXPECT_EQ(run.err.find("stopped alone"), std::string::npos) << run.err;
  EXPECT_FALSE(fileExists(dir.file("result.nc")));
  const std::string log = readFile(dir.file("case.log"));
  EXPECT_NE(log.find("Termination reques"), std::string::npos) << log;
  EXPECT_NE(log.find("Completion code : Abnormal"), std::string::npos) << log;
}

// A rank that cannot get the memory for its levels (here the one whose
// process may use less) ends every rank with the memory failure of a plain
// run, with exit code 1.
TEST_F(MpiRun, MemoryFailureOnOneRankEndsEveryRank) {
  TempDir dir;
  writeSlowCase(dir);
  // Each rank holds about 14 levels of 300 x 300 nodes (about 5 MB per grid);
  // rank 1 may have 40 MB of data, too little for its grids and workspaces.
  const std::string launch = std::string("if [ \"$OMPI_COMM_WORLD_RANK\" = 1 ]; then ulimit -d 40000; fi; exec ") +
                             KARNET_BINARY + " case.pfs";
  const ProcessResult run = runProgram(
      KARNET_MPIEXEC, {"-np", "3", "/bin/sh", "-c", launch}, dir.path(), kEnvironment);
  EXPECT_EQ(run.exitCode, 1) << run.err;
  EXPECT_EQ(run.err.find("stopped alone"), std::string::npos) << run.err;
  EXPECT_FALSE(fileExists(dir.file("result.nc")));
  const std::string log = readFile(dir.file("case.log"));
  EXPECT_NE(log.find("Completion code : Abnormal"), std::string::npos) << log;
  EXPECT_EQ(log.find("Statistics for local grid"), std::string::npos) << log;
}

}  // namespace
}  // namespace karnet::e2e
