// Run mode, parameter file and log file name from the command-line arguments.
#include "control/command_line.h"
#include "control/threads.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

namespace karnet {
namespace {

TEST(CommandLineTest, ModeAndParameterFileFollowTheArguments) {
  const std::string fits(259, 'p');
  struct Case {
    std::vector<std::string> arguments;
    bool host;
    bool quiet;
    int valid;
    std::string name;  // the last argument that is no switch, cut to fit the buffer
  };
  const Case cases[] = {
      {{"case.pfs"}, false, false, 1, "case.pfs"},
      {{"-DEBUG", "//Apv", "runs/case.pfs"}, true, false, 1, "runs/case.pfs"},
      {{"//apvx", "/apv", "case.pfs"}, false, false, 1, "case.pfs"},
      {{"case.pfs", "//APV"}, true, false, 0, "case.pfs"},
      {{"--quiet", "//apv", "case.pfs"}, true, true, 1, "case.pfs"},
      {{"//apv", "--QUIET", "case.pfs"}, true, true, 1, "case.pfs"},
      {{"case.pfs", "--quiet"}, false, true, 0, "case.pfs"},
      {{"-quiet", "case.pfs"}, false, false, 1, "case.pfs"},
      {{}, false, false, 0, ""},
      {{fits}, false, false, 1, fits},
      {{fits + "p"}, false, false, 0, fits},
      // A thread count and its value are no parameter file.
      {{"--threads", "4", "case.pfs"}, false, false, 1, "case.pfs"},
      {{"--THREADS=4", "--quiet", "//apv", "case.pfs"}, true, true, 1, "case.pfs"},
      {{"case.pfs", "--threads", "4"}, false, false, 0, "case.pfs"},
  };
  for (const Case& c : cases) {
    std::vector<const char*> arguments;
    for (const std::string& argument : c.arguments) arguments.push_back(argument.c_str());
    SCOPED_TRACE(arguments.empty() ? "(none)" : arguments.back());
    const int count = static_cast<int>(arguments.size());
    EXPECT_EQ(hasHostModeArgument(count, arguments.data()), c.host);
    EXPECT_EQ(hasQuietArgument(count, arguments.data()), c.quiet);
    char name[kFileNameSize];
    std::memset(name, 'x', sizeof name);
    EXPECT_EQ(selectParameterFile(count, arguments.data(), name), c.valid);
    EXPECT_EQ(std::string(name), c.name);
  }
}

TEST(CommandLineTest, ThreadCountFromTheSwitchElseTheEnvironment) {
  const struct {
    std::vector<std::string> arguments;
    const char* environment;
    int valid;
    int threads;  // 0: neither names one
  } cases[] = {
      {{"case.pfs"}, nullptr, 1, 0},
      {{"case.pfs"}, "", 1, 0},
      {{"case.pfs"}, "6", 1, 6},
      {{"--threads", "3", "case.pfs"}, "6", 1, 3},
      {{"--threads=2", "--threads", "5", "case.pfs"}, nullptr, 1, 5},  // the last one counts
      {{"--threads=4096", "case.pfs"}, nullptr, 1, 4096},
      // Anything but a whole number 1..4096 is refused, also when the switch wins.
      {{"--threads", "0", "case.pfs"}, nullptr, 0, 0},
      {{"--threads=4097", "case.pfs"}, nullptr, 0, 0},
      {{"--threads=", "case.pfs"}, nullptr, 0, 0},
      {{"--threads", "+2", "case.pfs"}, nullptr, 0, 0},
      {{"case.pfs", "--threads"}, "2", 0, 0},
      {{"case.pfs"}, "2 ", 0, 0},
      {{"case.pfs"}, "-1", 0, 0},
      {{"--threads", "3", "case.pfs"}, "junk", 1, 3},
  };
  for (const auto& c : cases) {
    std::vector<const char*> arguments;
    std::string joined;
    for (const std::string& argument : c.arguments) {
      arguments.push_back(argument.c_str());
      joined += argument + " ";
    }
    SCOPED_TRACE(joined + (c.environment != nullptr ? c.environment : "(unset)"));
    int threads = -1;
    EXPECT_EQ(selectThreadCount(static_cast<int>(arguments.size()), arguments.data(),
                                c.environment, &threads),
              c.valid);
    EXPECT_EQ(threads, c.threads);
  }
}

TEST(ThreadShareTest, LayersFirstAndRowsForWhatLayersCannotUse) {
  const struct {
    int threads;
    long long layers;
    int layerThreads, rowThreads;
  } cases[] = {
      {1, 10, 1, 1},   {2, 10, 2, 1},   {7, 20, 7, 1},   {7, 10, 7, 1},
      {8, 1, 1, 8},    // one level: every thread on its rows
      {7, 3, 3, 2},    // three layers of two threads each, one thread idle
      {16, 10, 5, 3},  // two rounds on three threads beat one round on one
      {4, 0, 1, 4},    {0, 5, 1, 1},
  };
  for (const auto& c : cases) {
    const ThreadShare share = shareThreads(c.threads, c.layers);
    EXPECT_EQ(share.layers, c.layerThreads) << c.threads << " threads, " << c.layers << " layers";
    EXPECT_EQ(share.rows, c.rowThreads) << c.threads << " threads, " << c.layers << " layers";
  }
}

TEST(CommandLineTest, LogFileLiesBesideTheParameterFileWhenItsNameFits) {
  const std::string directory(251, 'd');
  const struct {
    std::string parameterFile;
    int made;
    std::string log;
  } cases[] = {
      {"../runs/case1.PFS", 1, "../runs/case1.log"},
      {"runs.d/case1", 1, "runs.d/case1.log"},
      {"runs/case.v2.pfs", 1, "runs/case.v2.log"},
      {directory + "/a.pfs", 1, directory + "/a.log"},
      {std::string(256, 'd'), 0, ""},  // 256 + ".log" leaves no room for the end
  };
  for (const auto& c : cases) {
    char log[kFileNameSize] = "unchanged";
    EXPECT_EQ(makeLogFileName(c.parameterFile.c_str(), log), c.made) << c.parameterFile;
    EXPECT_EQ(std::string(log), c.log) << c.parameterFile;
  }
}

// The command line a result records can be pasted back into a shell.
TEST(CommandLineTest, CommandLineTextQuotesWhatTheShellWouldSplit) {
  const char* const arguments[] = {"--quiet", "my case.pfs", "it's", "", "a$b"};
  EXPECT_EQ(commandLineText("/opt/karnet", 5, arguments),
            "/opt/karnet --quiet 'my case.pfs' 'it'\\''s' '' 'a$b'");
  EXPECT_EQ(commandLineText(nullptr, 0, arguments), "karnet");
}

}  // namespace
}  // namespace karnet
