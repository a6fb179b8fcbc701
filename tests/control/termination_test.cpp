// How a run ends: exitRun, fatalError with its message rules, showMessage.
#include "control/termination.h"

#include <errno.h>
#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <string>

#include "child_process.h"
#include "control/log.h"

namespace karnet {
namespace {

using karnet::testing::ChildOutcome;
using karnet::testing::runChild;
using karnet::testing::TempFile;

// The program's base name as the C library saw it at start, without extension.
std::string programName() {
  std::string name = program_invocation_short_name;
  const std::size_t dot = name.rfind('.');
  return dot == std::string::npos ? name : name.substr(0, dot);
}

const char kAbnormalBlock[] =
    "\n--------------- RUN TIME INFORMATION --------------\n--\n-- CPU time        : 0 [s]\n"
    "--\n-- Completion code : Abnormal\n--\n---------------------------------------------------\n";
const char kSuccessfulBlock[] =
    "\n--------------- RUN TIME INFORMATION --------------\n--\n-- CPU time        : 0 [s]\n"
    "--\n-- Completion code : Successful\n--\n---------------------------------------------------\n";

struct Environment {
  const char* h84;        // null: unset
  const char* buildmode;  // null: unset
};

void setEnvironment(const Environment& environment) {
  if (environment.h84 != nullptr) setenv("H84", environment.h84, 1); else unsetenv("H84");
  if (environment.buildmode != nullptr) setenv("buildmode", environment.buildmode, 1);
  else unsetenv("buildmode");
}

// A child that opens its log, writes a first line and then runs body.
ChildOutcome runWithLog(const TempFile& log, const Environment& environment,
                        const std::function<void()>& body) {
  return runChild([&] {
    setEnvironment(environment);
    logSetStream(std::fopen(log.path().c_str(), "w"));
    logWrite("first line");
    body();
  });
}

TEST(ExitRunTest, WritesTheReportClosesTheLogAndExitsWithTheCode) {
  struct Case {
    std::int32_t code;
    const char* block;
  };
  const Case cases[] = {{0, kSuccessfulBlock}, {1, kAbnormalBlock}, {3, kAbnormalBlock}};
  for (const Case& c : cases) {
    TempFile log;
    const ChildOutcome outcome = runWithLog(log, {"WIN", nullptr}, [&] { exitRun(c.code); });
    EXPECT_TRUE(outcome.exited);
    EXPECT_EQ(outcome.exitCode, c.code);
    EXPECT_EQ(outcome.output, "");
    EXPECT_EQ(log.contents(), std::string("first line\n") + c.block);
  }
}

TEST(FatalErrorTest, ShowsTheMessageOnlyInAKnownRunModeAndNotInNightlyBuilds) {
  struct Case {
    Environment environment;
    bool shown;
  };
  const Case cases[] = {
      {{"WIN", nullptr}, true},    {{"win", nullptr}, true},     {{"APV", nullptr}, true},
      {{"Apv", nullptr}, true},    {{"WIN", "day"}, true},       {{nullptr, nullptr}, false},
      {{"DOS", nullptr}, false},   {{"WIN", "nigth"}, false},    {{"APV", "NIGTH"}, false},
      {{"win", "NiGtH"}, false},
  };
  for (const Case& c : cases) {
    const std::string label = std::string(c.environment.h84 ? c.environment.h84 : "(unset)") +
                              "/" + (c.environment.buildmode ? c.environment.buildmode : "(unset)");
    TempFile log;
    const ChildOutcome outcome =
        runWithLog(log, c.environment, [] { fatalError("Error in parameter file"); });
    EXPECT_TRUE(outcome.exited) << label;
    EXPECT_EQ(outcome.exitCode, 1) << label;
    EXPECT_EQ(outcome.output, c.shown ? programName() + ": Error in parameter file\n" : "") << label;
    // The log is the same whether or not the message was shown.
    EXPECT_EQ(log.contents(), std::string("first line\nError in parameter file\n") + kAbnormalBlock)
        << label;
  }
}

TEST(FatalErrorTest, ExitsWithTheGivenCode) {
  TempFile log;
  const ChildOutcome outcome = runWithLog(log, {"WIN", "nigth"}, [] {
    const std::int32_t code = 8;
    fatalError("Floating point exception", &code);
  });
  EXPECT_EQ(outcome.exitCode, 8);
  EXPECT_EQ(log.contents(),
            std::string("first line\nFloating point exception\n") + kAbnormalBlock);
}

TEST(FatalErrorTest, BeforeTheLogIsOpenTheMessageOnlyReachesTheUser) {
  const ChildOutcome outcome = runChild([] {
    setEnvironment({"WIN", nullptr});
    logSetStream(nullptr);
    fatalError("Usage: karnet.exe [//apv] [options] pfs-file");
  });
  EXPECT_EQ(outcome.exitCode, 1);
  EXPECT_EQ(outcome.output, programName() + ": Usage: karnet.exe [//apv] [options] pfs-file\n");
}

TEST(FatalErrorTest, FramingNewlinesStayInTheLogButNotOnTheMessageLine) {
  TempFile log;
  const ChildOutcome outcome =
      runWithLog(log, {"WIN", nullptr}, [] { fatalError("\nUnable to allocate memory \n"); });
  EXPECT_EQ(outcome.exitCode, 1);
  EXPECT_EQ(outcome.output, programName() + ": Unable to allocate memory \n");
  EXPECT_EQ(log.contents(), std::string("first line\n\nUnable to allocate memory \n") + kAbnormalBlock);
}

TEST(ShowMessageTest, WritesOneLineAndReturnsWithoutWaiting) {
  // Standard input that never delivers a key: a message box that waited would time out.
  int fds[2];
  ASSERT_EQ(pipe(fds), 0);
  karnet::testing::ChildSetup setup;
  setup.stdinFd = fds[0];
  setup.timeoutMs = 5000;
  const ChildOutcome outcome = runChild(
      [] {
        setenv("H84", "WIN", 1);
        showMessage("Termination reques");
        showMessage("second");
      },
      setup);
  close(fds[0]);
  close(fds[1]);
  EXPECT_FALSE(outcome.timedOut);
  EXPECT_EQ(outcome.exitCode, 0);
  EXPECT_EQ(outcome.output, programName() + ": Termination reques\n" + programName() + ": second\n");
}

TEST(ModuleBaseNameTest, GivesTheProgramNameWithoutDirectoryOrExtension) {
  char name[260] = "unchanged";
  moduleBaseName(name, sizeof name);
  EXPECT_EQ(name, programName());
  EXPECT_EQ(std::strchr(name, '/'), nullptr);

  char small[5];
  moduleBaseName(small, sizeof small);
  EXPECT_EQ(std::string(small), programName().substr(0, 4));
}

}  // namespace
}  // namespace karnet
