// How a run ends: the log and its run-time report, fatalError with its message
// rules, and caught signals.
#include <gtest/gtest.h>
#include <signal.h>
#include <unistd.h>

#include <climits>
#include <cstdlib>
#include <map>
#include <string>

#include "child_process.h"
#include "control/log.h"
#include "control/progress.h"
#include "control/signals.h"
#include "control/termination.h"

namespace karnet {
namespace {

using namespace karnet::testing;

// Everything fn writes to the log stream.
std::string logged(const std::function<void()>& fn) {
  TempFile file;
  logSetStream(std::fopen(file.path.c_str(), "w"));
  fn();
  logClose();
  return file.contents();
}

TEST(LogTest, WriteAddsANewlineOnlyToTextsWithoutAnyAndTheOthersWriteExactly) {
  const std::pair<std::function<void()>, std::string> cases[] = {
      {[] { logWrite("Error in parameter file"); }, "Error in parameter file\n"},
      {[] { logWrite("first\nsecond"); }, "first\nsecond"},
      {[] { logWrite(""); }, "\n"},
      {[] { logWrite(nullptr); }, ""},
      {[] { logPrintf("%d:%.2f", 7, 0.5); }, "7:0.50"},
  };
  for (const auto& [write, written] : cases) EXPECT_EQ(logged(write), written);
  EXPECT_EQ(logStream, nullptr);  // closing forgets the stream
}

// A child in the state of a running computation, with H84 and buildmode set
// (null: unset), its standard input a pipe that never delivers a key.
ChildOutcome runComputation(const TempFile& log, const char* h84, const char* buildmode,
                            const std::function<void()>& body) {
  int fds[2];
  if (pipe(fds) != 0) return {};
  const ChildOutcome outcome = runChild([&] {
    for (const auto& [name, value] : {std::pair("H84", h84), {"buildmode", buildmode}}) {
      value != nullptr ? setenv(name, value, 1) : unsetenv(name);
    }
    logSetStream(std::fopen(log.path.c_str(), "w"));
    logWrite("computing");
    body();
  }, {.stdinFd = fds[0]});
  close(fds[0]);
  close(fds[1]);
  return outcome;
}

TEST(EndingTest, MessagesAreShownOutsideNightlyBuildsAndTheLogGetsTheReport) {
  const auto parameterError = [] { fatalError("Error in parameter file"); };
  const std::string parameterErrorLog = "Error in parameter file\n" + reportBlock("Abnormal");
  const struct {
    const char* h84;
    const char* buildmode;
    std::function<void()> end;
    int exitCode;
    std::string shown;   // on standard error, after the program name
    std::string logged;  // after the first line
  } cases[] = {
      // fatalError shows its message only in a known run mode and not in nightly builds.
      {"Apv", "day", parameterError, 1, "Error in parameter file\n", parameterErrorLog},
      {nullptr, nullptr, parameterError, 1, "", parameterErrorLog},
      {"WIN", "nigth", [] { const std::int32_t code = 8; fatalError("Overflow", &code); }, 8, "",
       "Overflow\n" + reportBlock("Abnormal")},
      // Framing newlines stay in the log but not on the message line.
      {"WIN", nullptr, [] { fatalError("\nNo memory \n"); }, 1, "No memory \n",
       "\nNo memory \n" + reportBlock("Abnormal")},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(::testing::Message() << (c.h84 ? c.h84 : "-") << "/"
                                      << (c.buildmode ? c.buildmode : "-") << " " << c.logged);
    TempFile log;
    const ChildOutcome outcome = runComputation(log, c.h84, c.buildmode, c.end);
    EXPECT_EQ(outcome.exitCode, c.exitCode);
    EXPECT_EQ(outcome.output, c.shown.empty() ? "" : programName() + ": " + c.shown);
    EXPECT_EQ(log.contents(), "computing\n" + c.logged);
  }
}

const std::map<int, const char*> kSignalMessages = {
    {SIGFPE, "Floating point exception"}, {SIGILL, "Illegal instruction"},
    {SIGINT, "Control-C send"},           {SIGSEGV, "Illegal storage access"},
    {SIGTERM, "Termination reques"},
};

// In a running computation with the handlers in place, arrive(number) makes
// the signal arrive; the run ends with the signal's message and number.
void expectEndBySignal(int number, void (*arrive)(int number)) {
  SCOPED_TRACE(kSignalMessages.at(number));
  TempFile log;
  const ChildOutcome outcome = runComputation(log, "WIN", "nigth", [&] {
    installSignalHandlers();
    // The run driver ends the run for what the computation throws.
    try {
      arrive(number);
    } catch (const RunError& error) {
      endRun(error);
    }
    _exit(99);
  });
  EXPECT_EQ(outcome.exitCode, number);
  EXPECT_EQ(log.contents(), std::string("computing\n") + kSignalMessages.at(number) + "\n" +
                                reportBlock("Abnormal"));
}

TEST(SignalHandlerTest, EachSignalEndsTheRunWithItsMessageAndNumber) {
  // Interrupts are taken up at the computation's next cancel check...
  for (const auto& [number, message] : kSignalMessages) {
    expectEndBySignal(number, [](int n) { raise(n); progressCheckCancel(); });
  }
  // ...or after a while when none comes, at once at a second interrupt,
  // and before the handlers are restored.
  expectEndBySignal(SIGTERM, [](int n) { raise(n); for (;;) usleep(100000); });
  expectEndBySignal(SIGINT, [](int n) { raise(n); raise(n); });
  expectEndBySignal(SIGINT, [](int n) { raise(n); restoreSignalHandlers(); });
}

// Uses 4 KiB of stack per level until the stack runs out.
int recurseDeeply(int depth) {
  volatile char frame[4096];
  frame[0] = static_cast<char>(depth);
  if (depth == INT_MAX) return frame[0];
  return recurseDeeply(depth + 1) + frame[0];
}

TEST(SignalHandlerTest, RealFaultsAreCaught) {
#ifdef KARNET_SANITIZED
  GTEST_SKIP() << "the sanitizers report these faults before the signal is raised";
#endif
  expectEndBySignal(SIGSEGV, [](int) { volatile int* nowhere = nullptr; *nowhere = 1; });
  // A stack overflow leaves no stack for the handler but its own.
  expectEndBySignal(SIGSEGV, [](int) { recurseDeeply(0); });
}

}  // namespace
}  // namespace karnet
