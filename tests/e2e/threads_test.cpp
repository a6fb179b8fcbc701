// Complete runs on several threads: the result file and the log are the same bytes whatever
// the number of threads, and a threaded run stops cleanly when cancelled or interrupted.
#include <gtest/gtest.h>
#include <signal.h>

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <sstream>
#include <string>
#include <vector>

#include "e2e/e2e_support.h"

namespace karnet::e2e {
namespace {

// Nightly mode, and a fixed time for the result's history, so that repeated
// runs give the same bytes.
const std::map<std::string, std::string> kNightly = {{"buildmode", "nigth"},
                                                     {"SOURCE_DATE_EPOCH", "1700000000"}};
const std::string kEarlier = "an earlier result";

// The grid origin (11.3 E, 55.2 N) in UTM zone 32, metres.
constexpr double kUtmX = 646381.2, kUtmY = 6119460.7;

// A 90 x 70 node basin (LOCAL, 100 m; or in UTM zone 32 from 11.3 E, 55.2 N, turned by the
// meridian convergence there) whose bed deepens eastwards and northwards, with a dry island
// and a dry corner, and casts at scattered positions (between nodes) reaching at most
// castDepth metres down. A fixed generator makes the same case every time.
void writeBasin(const TempDir& dir, const ParameterFile& parameters, double castDepth,
                bool utm = false) {
  BathymetrySpec b = localBasin(90, 70, 100.0, 0.0f, 0.0, 0.0);
  if (utm) {
    b.projection = "UTM-32";
    b.originLongitude = 11.3;
    b.originLatitude = 55.2;
  }
  for (int j = 0; j < b.ny; ++j) {
    for (int i = 0; i < b.nx; ++i) {
      const double di = i - 40.0, dj = j - 30.0;
      const bool dry = di * di + dj * dj < 36.0 || (i >= 80 && j >= 60);
      b.heights[static_cast<std::size_t>(j) * b.nx + i] =
          dry ? 10.0f : -(4.0f + 0.3f * static_cast<float>(i) + 0.2f * static_cast<float>(j));
    }
  }
  writeBathymetry(dir.file("bathymetry.nc"), b);

  std::uint32_t seed = 12345;
  auto next = [&seed] {
    seed = seed * 1664525u + 1013904223u;
    return static_cast<double>(seed >> 8) / 16777216.0;
  };
  std::ostringstream obs;
  obs.precision(10);
  for (int cast = 0; cast < 70; ++cast) {
    const double x = next() * 8900.0, y = next() * 6900.0;
    const double bed = 4.0 + 0.3 * x / 100.0 + 0.2 * y / 100.0;
    for (double z = -0.7; z > -bed && z > -castDepth; z -= 1.3) {
      obs << x + (utm ? kUtmX : 0.0) << ' ' << y + (utm ? kUtmY : 0.0) << ' ' << z << ' '
          << 12.0 + 0.2 * z + 0.0004 * x - 0.0003 * y + next() << '\n';
    }
  }
  writeFile(dir.file("observations.txt"), obs.str());
  writeFile(dir.file("case.pfs"), parameters.render());
}

struct RunOutput {
  int exitCode = -1;
  std::string result;         // the result file's bytes
  std::vector<float> values;  // and its values
  std::string log;            // without the CPU time
};

RunOutput runWith(const TempDir& dir, const std::vector<std::string>& args,
                  std::map<std::string, std::string> env) {
  env.insert(kNightly.begin(), kNightly.end());
  const ProcessResult r = runKarnet(args, dir.path(), env);
  RunOutput out{r.exitCode, readFile(dir.file("result.nc")), {},
                withoutCpuTime(readFile(dir.file("case.log")))};
  if (r.exitCode == 0) {
    int shape[3];
    out.values = readResult(dir.file("result.nc"), nullptr, shape);
  }
  return out;
}

bool sameBits(const std::vector<float>& a, const std::vector<float>& b) {
  return a.size() == b.size() && std::memcmp(a.data(), b.data(), a.size() * sizeof(float)) == 0;
}

struct ThreadCase {
  const char* name;
  std::string analysis;
  std::string filterType;
  std::string zRange;
  double castDepth;
  bool utm = false;
};

TEST(ThreadedRun, SameResultAndLogForOneTwoAndSevenThreads) {
  const ThreadCase cases[] = {
      // Many levels, the deeper ones dry in most columns.
      {"bilinear, many levels", "bilinear", "'12 pts filter'", "0, 19", 100.0},
      {"objective, twelve-point, many levels", "objective", "'12 pts filter'", "0, 19", 100.0},
      {"objective, Shapiro, many levels", "objective", "'shapiro'", "0, 19", 100.0},
      // A single level: all threads share the rows of one layer.
      {"bilinear, one level", "bilinear", "'12 pts filter'", "4, 4", 100.0},
      {"objective, twelve-point, one level", "objective", "'12 pts filter'", "4, 4", 100.0},
      {"objective, Shapiro, one level", "objective", "'shapiro'", "4, 4", 100.0},
      // Casts of at most 8 m, no extension: the levels below hold no data at all.
      {"bilinear, empty levels", "bilinear", "'12 pts filter'", "0, 11", 8.0},
      {"objective, twelve-point, empty levels", "objective", "'12 pts filter'", "0, 11", 8.0},
      {"objective, Shapiro, empty levels", "objective", "'shapiro'", "0, 11", 8.0},
      // Projected: every node's longitude and latitude made on the threads as well.
      {"bilinear, UTM", "bilinear", "'12 pts filter'", "0, 19", 100.0, true},
  };
  for (const ThreadCase& c : cases) {
    SCOPED_TRACE(c.name);
    TempDir dir;
    ParameterFile p;
    p.analysis = c.analysis;
    p.filterType = c.filterType;
    p.zRange = c.zRange;
    p.spacing = "2";
    p.searchRadius = "1500";
    p.maxExtrapolationDistance = c.castDepth < 50.0 ? "0, 0" : "3, 6";
    p.zeroCrossingDistance = "2500";
    p.decayDistance = "900";
    p.correlationSampleSize = "6";
    p.filterOperations = "2";
    if (c.utm) p.projection = "'UTM-32'";
    writeBasin(dir, p, c.castDepth, c.utm);

    const RunOutput one = runWith(dir, {"case.pfs"}, {{"KARNET_THREADS", "1"}});
    ASSERT_EQ(one.exitCode, 0) << one.log;
    ASSERT_FALSE(one.result.empty());
    EXPECT_TRUE(contains(one.log, "Statistics for local grid")) << one.log;
    if (c.utm) {
      // The casts lie in the grid (the result is not one fill value), and the nodes have
      // their positions.
      ASSERT_FALSE(one.values.empty());
      EXPECT_NE(*std::min_element(one.values.begin(), one.values.end()),
                *std::max_element(one.values.begin(), one.values.end()));
      const std::vector<double> lat = readVariable(dir.file("result.nc"), "lat");
      ASSERT_EQ(lat.size(), 90u * 70u);
      EXPECT_NEAR(lat.front(), 55.2, 1e-6);
      EXPECT_GT(lat.back(), 55.25);
    }
    if (c.analysis == "objective" && c.castDepth < 50.0) {
      // The objective analysis of levels without data fails at every wet node: with casts of
      // at most 8 m and levels every 2 m, the failures outnumber the estimates.
      const auto number = [&one](const std::string& label) {
        const auto at = one.log.find(label);
        return at == std::string::npos ? -1 : std::stoll(one.log.substr(at + label.size()));
      };
      const long long estimates = number("No. of interpolations                   : ");
      EXPECT_GT(estimates, 0) << one.log;
      EXPECT_GT(number("No. of unsuccesful interpolations       : "), estimates) << one.log;
    }
    for (const char* threads : {"2", "7"}) {
      SCOPED_TRACE(threads);
      const RunOutput many = runWith(dir, {"case.pfs"}, {{"KARNET_THREADS", threads}});
      ASSERT_EQ(many.exitCode, 0) << many.log;
      EXPECT_TRUE(many.result == one.result) << "result files differ";
      EXPECT_TRUE(sameBits(many.values, one.values));
      EXPECT_EQ(many.log, one.log);
    }
  }
}

TEST(ThreadedRun, ThreadCountFromTheSwitchOrTheEnvironment) {
  TempDir dir;
  ParameterFile p;
  p.zRange = "0, 5";
  p.spacing = "2";
  writeBasin(dir, p, 100.0);
  const RunOutput reference = runWith(dir, {"case.pfs"}, {{"KARNET_THREADS", "1"}});
  ASSERT_EQ(reference.exitCode, 0) << reference.log;
  // The switch wins over the environment; both forms of the switch are taken.
  // (The result's history records the command line, so only the values compare.)
  for (const std::vector<std::string>& args :
       {std::vector<std::string>{"--threads", "3", "case.pfs"},
        std::vector<std::string>{"--threads=5", "//apv", "case.pfs"}}) {
    const RunOutput out = runWith(dir, args, {{"KARNET_THREADS", "nonsense"}});
    EXPECT_EQ(out.exitCode, 0) << out.log;
    EXPECT_TRUE(sameBits(out.values, reference.values));
    EXPECT_EQ(out.log, reference.log);
  }
  // A count that is no whole number from 1 on stops before the run begins, leaving no log
  // (the forms refused are the command line's tests).
  TempDir empty;
  writeFile(empty.file("case.pfs"), p.render());
  const ProcessResult r = runKarnet({"case.pfs"}, empty.path(), {{"KARNET_THREADS", "-4"}});
  EXPECT_EQ(r.exitCode, 1);
  EXPECT_NE(r.err.find("--threads and KARNET_THREADS take a number from 1 to 4096"),
            std::string::npos)
      << r.err;
  EXPECT_FALSE(fileExists(empty.file("case.log")));
}

// A case that computes for a while even on several threads: objective analysis of a
// 600 x 600 node layer stack.
void writeSlowCase(const TempDir& dir, const std::string& analysis) {
  const int n = 600;
  writeBathymetry(dir.file("bathymetry.nc"), localBasin(n, n, 50.0, -40.0f, 11.3, 55.2));
  std::ostringstream obs;
  for (int j = 0; j < n; j += 20) {
    for (int i = 0; i < n; i += 20) {
      for (int level = 1; level <= 19; ++level) {
        obs << 50.0 * i + 7.0 << ' ' << 50.0 * j + 3.0 << ' ' << -2.0 * level << ' '
            << 5 + 0.1 * level + 0.001 * i << '\n';
      }
    }
  }
  writeFile(dir.file("observations.txt"), obs.str());
  ParameterFile p;
  p.analysis = analysis;
  p.zRange = "0, 19";
  p.spacing = "2";
  p.searchRadius = "3000";
  p.correlationSampleSize = "12";
  writeFile(dir.file("case.pfs"), p.render());
}

// What the log holds after the basic grid's last line.
std::string afterBasicGrid(const std::string& log) {
  const auto at = log.find("Number of z-nodes:");
  if (at == std::string::npos) return "";
  const auto end = log.find('\n', at);
  return end == std::string::npos ? "" : log.substr(end + 1);
}

// Waits until the run computes its layers, then sends the signal once.
std::function<bool(int)> signalWhileComputing(const TempDir& dir, int signal) {
  return [&dir, signal](int pid) {
    if (!contains(readFile(dir.file("case.log")), "Number of z-nodes")) return false;
    kill(pid, signal);
    return true;
  };
}

// An interrupt stops every thread: the log ends with its message right after the basic grid,
// the exit code is the signal's number, and the earlier result stays. A host's cancel (SIGUSR1
// under //apv) ends the run successfully, also without a result.
TEST(ThreadedRun, InterruptsAndCancelStopEveryThreadAndKeepTheEarlierResult) {
  const struct {
    const char* analysis;
    const char* threads;
    int signal;
    std::string message;  // the log's next line after the basic grid
  } cases[] = {
      {"objective", "4", SIGINT, "Control-C send"},
      {"bilinear", "4", SIGINT, "Control-C send"},
      {"bilinear", "1", SIGTERM, "Termination reques"},
      {"objective", "4", SIGUSR1, ""},
      {"bilinear", "1", SIGUSR1, ""},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(testing::Message() << c.analysis << " on " << c.threads << ", signal "
                                    << c.signal);
    TempDir dir;
    writeSlowCase(dir, c.analysis);
    writeFile(dir.file("result.nc"), kEarlier);
    std::map<std::string, std::string> env = kNightly;
    env["KARNET_THREADS"] = c.threads;
    const bool cancel = c.signal == SIGUSR1;
    const CaseRun r = runCase(dir, cancel ? std::vector<std::string>{"//apv", "case.pfs"}
                                          : std::vector<std::string>{"case.pfs"},
                              env, signalWhileComputing(dir, c.signal));
    EXPECT_EQ(r.termSignal, 0);
    EXPECT_EQ(r.exitCode, cancel ? 0 : c.signal);
    EXPECT_EQ(afterBasicGrid(r.log).rfind(
                  cancel ? "\n--------------- RUN TIME INFORMATION" : c.message + "\n", 0),
              0u)
        << r.log;
    EXPECT_TRUE(contains(r.log, cancel ? "-- Completion code : Successful"
                                       : "-- Completion code : Abnormal"))
        << r.log;
    // The host shows the cancel; the log only ends.
    EXPECT_EQ(contains(r.err, "Cancel computation"), cancel) << r.err;
    EXPECT_EQ(readFile(dir.file("result.nc")), kEarlier);
    EXPECT_EQ(listDir(dir.path()).size(), 5u);
  }
}

}  // namespace
}  // namespace karnet::e2e
