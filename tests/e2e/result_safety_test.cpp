// The result file under pressure: two runs writing it at once, a full disk, a grid larger
// than the memory the process may have, and very long observation files.
#include <gtest/gtest.h>
#include <sys/mount.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "e2e/e2e_support.h"

namespace karnet::e2e {
namespace {

namespace fs = std::filesystem;

// Starts karnet on a parameter file in dir without waiting; the environment is made before
// the fork, so the child only changes directory and executes.
pid_t startKarnet(const std::string& dir, const std::string& parameterFile) {
  static char quiet[] = "buildmode=nigth";
  // A fixed making time, so that results of the same run compare equal byte for byte.
  static char madeAt[] = "SOURCE_DATE_EPOCH=1700000000";
  static char* const environment[] = {quiet, madeAt, nullptr};
  const std::string program = KARNET_BINARY;
  char* const argv[] = {const_cast<char*>(program.c_str()),
                        const_cast<char*>(parameterFile.c_str()), nullptr};
  const pid_t pid = fork();
  if (pid == 0) {
    if (chdir(dir.c_str()) != 0) _exit(127);
    execve(program.c_str(), argv, environment);
    _exit(127);
  }
  return pid;
}

int waitFor(pid_t pid) {
  int status = 0;
  if (waitpid(pid, &status, 0) != pid) return -1;
  return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

// Hidden temporary names of the result writer that a run might leave behind.
std::vector<std::string> leftovers(const std::string& dir) {
  std::vector<std::string> names;
  for (const std::string& name : listDir(dir)) {
    if (name.find(".tmp") != std::string::npos) names.push_back(name);
  }
  return names;
}

TEST(ResultSafety, TwoRunsWritingOneResultLeaveOneCompleteFile) {
  TempDir dir;
  ParameterFile p;
  const std::string observations = writeSmallCase(dir, p);
  // Run b sees the same casts 100 degrees warmer, so its result differs in every wet node.
  std::string warmer;
  for (const std::string& line : splitLines(observations)) {
    double x, y, z, v;
    ASSERT_EQ(std::sscanf(line.c_str(), "%lf %lf %lf %lf", &x, &y, &z, &v), 4);
    warmer += std::to_string(x) + ' ' + std::to_string(y) + ' ' + std::to_string(z) + ' ' +
              std::to_string(v + 100.0) + '\n';
  }
  writeFile(dir.file("warmer.txt"), warmer);
  ParameterFile b = p;
  b.dataFileName = "|warmer.txt|";
  b.maxData = "200";
  writeFile(dir.file("a.pfs"), p.render());
  writeFile(dir.file("b.pfs"), b.render());

  ASSERT_EQ(waitFor(startKarnet(dir.path(), "a.pfs")), 0) << readFile(dir.file("a.log"));
  const std::string resultA = readFile(dir.file("result.nc"));
  ASSERT_EQ(waitFor(startKarnet(dir.path(), "b.pfs")), 0) << readFile(dir.file("b.log"));
  const std::string resultB = readFile(dir.file("result.nc"));
  ASSERT_NE(resultA, resultB);

  int seenA = 0, seenB = 0;
  for (int round = 0; round < 8; ++round) {
    SCOPED_TRACE(round);
    const pid_t first = startKarnet(dir.path(), round % 2 == 0 ? "a.pfs" : "b.pfs");
    const pid_t second = startKarnet(dir.path(), round % 2 == 0 ? "b.pfs" : "a.pfs");
    EXPECT_EQ(waitFor(first), 0);
    EXPECT_EQ(waitFor(second), 0);
    const std::string result = readFile(dir.file("result.nc"));
    const bool isA = result == resultA, isB = result == resultB;
    EXPECT_TRUE(isA || isB) << "the result is a mix of both runs (" << result.size() << " bytes)";
    seenA += isA;
    seenB += isB;
    int shape[3];
    EXPECT_EQ(readResult(dir.file("result.nc"), nullptr, shape).size(), 30u * 24u * 12u);
    EXPECT_TRUE(leftovers(dir.path()).empty());
  }
  EXPECT_EQ(seenA + seenB, 8);
}

// Runs karnet with its address space limited to limitBytes; gives its exit code.
int runLimited(const std::string& dir, std::uint64_t limitBytes) {
  const std::string command =
      "ulimit -v " + std::to_string(limitBytes >> 10) + " && exec " KARNET_BINARY " case.pfs";
  return runProgram("/bin/sh", {"-c", command}, dir, kBatch).exitCode;
}

TEST(ResultSafety, GridsBeyondTheMemoryLimitStopBeforeAllocating) {
#ifdef KARNET_SANITIZED
  GTEST_SKIP() << "the sanitizers' shadow memory does not fit a limited address space";
#endif
  constexpr std::uint64_t kLimit = std::uint64_t{1} << 30;
  {
    SCOPED_TRACE("result grid");
    TempDir dir;
    ParameterFile p;
    p.zRange = "0, 2000000";  // 30 x 24 x 2000001 nodes: 5.8 GB of floats
    writeSmallCase(dir, p);
    writeFile(dir.file("result.nc"), "earlier\n");
    EXPECT_EQ(runLimited(dir.path(), kLimit), 1);
    const std::string log = readFile(dir.file("case.log"));
    EXPECT_NE(log.find("\nResult grid of 30 x 24 x 2000001 nodes and "), std::string::npos) << log;
    EXPECT_NE(log.find("; at most 1073741824 bytes of memory are available\n"), std::string::npos)
        << log;
    EXPECT_NE(log.find("\nERROR: Unable to allocate memory\n"), std::string::npos) << log;
    EXPECT_EQ(readFile(dir.file("result.nc")), "earlier\n");
  }
  {
    SCOPED_TRACE("basic grid");
    TempDir dir;
    const std::string observations = writeSmallCase(dir, ParameterFile{});
    // One cast 800 km away stretches the basic grid over 3202 x 3202 x 14 nodes.
    const std::string more = observations + "801000 802000 -3 7\n";
    writeFile(dir.file("observations.txt"), more);
    // Two volumes and two layers of floats, the result grid and 32 bytes per observation.
    const std::uint64_t needed = 8ull * 3202 * 3202 * 14 + 8ull * 3202 * 3202 +
                                 4ull * 30 * 24 * 12 + 32ull * splitLines(more).size();
    EXPECT_EQ(runLimited(dir.path(), kLimit), 1);
    const std::string log = readFile(dir.file("case.log"));
    EXPECT_NE(log.find("\nBasic grid of 3202 x 3202 x 14 nodes needs " + std::to_string(needed) +
                       " bytes with the result grid and the observations;"),
              std::string::npos)
        << log;
    EXPECT_NE(log.find("at most 1073741824 bytes of memory are available\n"), std::string::npos)
        << log;
    EXPECT_NE(log.find("\nUnable to allocate memory \n"), std::string::npos) << log;
  }
}

TEST(ResultSafety, AFullDiskKeepsTheEarlierResult) {
  TempDir dir;
  const std::string mountPoint = dir.file("small");
  fs::create_directory(mountPoint);
  if (geteuid() != 0 || mount("tmpfs", mountPoint.c_str(), "tmpfs", 0, "size=64k") != 0) {
    GTEST_SKIP() << "needs root and permission to mount a tmpfs";
  }
  struct Unmount {
    std::string path;
    ~Unmount() { umount2(path.c_str(), MNT_DETACH); }
  } unmount{mountPoint};
  ParameterFile p;
  p.outputFileName = "|small/result.nc|";
  writeSmallCase(dir, p);
  writeFile(dir.file("small/result.nc"), "earlier\n");
  // Fill what is left: the new result (about 40 kB) cannot be written.
  std::ofstream filler(dir.file("small/filler"), std::ios::binary);
  const std::string block(4096, 'x');
  while (filler.write(block.data(), block.size())) {
  }
  filler.close();
  const CaseRun r = runCase(dir);
  EXPECT_EQ(r.exitCode, 1) << r.log;
  EXPECT_TRUE(contains(r.log, "\nERROR while writing result file\n")) << r.log;
  EXPECT_EQ(readFile(dir.file("small/result.nc")), "earlier\n");
  EXPECT_TRUE(leftovers(mountPoint).empty());
}

TEST(ResultSafety, FiveMillionObservationLinesAreRead) {
  TempDir dir;
  writeSmallCase(dir, ParameterFile{});
  // Five casts, each repeated a million times: the same answer as one of each.
  const std::vector<std::string> casts = {"1250 2500 -2 8\n", "3500 4000 -4 7\n",
                                          "5000 3000 -6 6\n", "2000 6000 -3 5\n",
                                          "6000 5500 -5 4\n"};
  {
    std::string text;
    text.reserve(16 * 5000000);
    for (int i = 0; i < 1000000; ++i) {
      for (const std::string& cast : casts) text += cast;
    }
    writeFile(dir.file("observations.txt"), text);
  }
  const auto start = std::chrono::steady_clock::now();
  const CaseRun many = runCase(dir);
  [[maybe_unused]] const double seconds =
      std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
  ASSERT_EQ(many.exitCode, 0) << many.log;
#ifndef KARNET_SANITIZED
  EXPECT_LT(seconds, 60.0);  // about 3 s on a quiet machine: nothing grows with the line count squared
#endif
  int shape[3];
  const std::vector<float> manyValues = readResult(dir.file("result.nc"), nullptr, shape);

  std::string once;
  for (const std::string& cast : casts) once += cast;
  writeFile(dir.file("observations.txt"), once);
  ASSERT_EQ(runCase(dir).exitCode, 0);
  EXPECT_EQ(readResult(dir.file("result.nc"), nullptr, shape), manyValues);
}

}  // namespace
}  // namespace karnet::e2e
