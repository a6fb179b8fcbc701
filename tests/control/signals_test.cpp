// Caught signals end the run through the fatal path with the signal's number.
#include "control/signals.h"

#include <gtest/gtest.h>
#include <signal.h>
#include <unistd.h>

#include <climits>
#include <string>

#include "child_process.h"
#include "control/log.h"
#include "control/progress.h"

namespace karnet {
namespace {

using karnet::testing::ChildOutcome;
using karnet::testing::runChild;
using karnet::testing::TempFile;

struct HandledSignal {
  int number;
  const char* message;
};

const HandledSignal kHandled[] = {
    {SIGFPE, "Floating point exception"}, {SIGILL, "Illegal instruction"},
    {SIGINT, "Control-C send"},           {SIGSEGV, "Illegal storage access"},
    {SIGTERM, "Termination reques"},
};

std::string expectedLog(const char* message) {
  return std::string("computing\n") + message +
         "\n\n--------------- RUN TIME INFORMATION --------------\n--\n"
         "-- CPU time        : 0 [s]\n--\n-- Completion code : Abnormal\n--\n"
         "---------------------------------------------------\n";
}

// A child in the state of a running computation: log open, handlers in place.
ChildOutcome runComputation(const TempFile& log, const std::function<void()>& body) {
  return runChild([&] {
    setenv("H84", "WIN", 1);
    setenv("buildmode", "nigth", 1);
    logSetStream(std::fopen(log.path().c_str(), "w"));
    installSignalHandlers();
    logWrite("computing");
    body();
  });
}

TEST(SignalHandlerTest, EachSignalEndsTheRunWithItsMessageAndNumber) {
  for (const HandledSignal& handled : kHandled) {
    TempFile log;
    const ChildOutcome outcome = runComputation(log, [&] {
      raise(handled.number);
      // Interrupts are taken up at the computation's next cancel check.
      progressCheckCancel();
      _exit(99);
    });
    EXPECT_TRUE(outcome.exited) << handled.message;
    EXPECT_EQ(outcome.exitCode, handled.number) << handled.message;
    EXPECT_EQ(log.contents(), expectedLog(handled.message));
  }
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
  TempFile segvLog;
  ChildOutcome outcome = runComputation(segvLog, [] {
    volatile int* nowhere = nullptr;
    *nowhere = 1;
  });
  EXPECT_EQ(outcome.exitCode, SIGSEGV);
  EXPECT_EQ(segvLog.contents(), expectedLog("Illegal storage access"));

  // A stack overflow leaves no stack for the handler but its own.
  TempFile overflowLog;
  outcome = runComputation(overflowLog, [] {
    recurseDeeply(0);
  });
  EXPECT_EQ(outcome.exitCode, SIGSEGV);
  EXPECT_EQ(overflowLog.contents(), expectedLog("Illegal storage access"));

  TempFile fpeLog;
  outcome = runComputation(fpeLog, [] {
    volatile int one = 1;
    volatile int zero = 0;
    volatile int quotient = one / zero;
    (void)quotient;
  });
  EXPECT_EQ(outcome.exitCode, SIGFPE);
  EXPECT_EQ(fpeLog.contents(), expectedLog("Floating point exception"));
}

TEST(SignalHandlerTest, InterruptEndsTheRunAlsoWhenNoCancelCheckComes) {
  TempFile log;
  const ChildOutcome outcome = runComputation(log, [] {
    raise(SIGTERM);
    for (int i = 0; i < 100; ++i) usleep(100000);  // busy elsewhere for ten seconds
    _exit(99);
  });
  EXPECT_EQ(outcome.exitCode, SIGTERM);
  EXPECT_EQ(log.contents(), expectedLog("Termination reques"));
}

TEST(SignalHandlerTest, SecondInterruptEndsTheRunAtOnce) {
  TempFile log;
  const ChildOutcome outcome = runComputation(log, [] {
    raise(SIGINT);
    raise(SIGINT);
    _exit(99);
  });
  EXPECT_EQ(outcome.exitCode, SIGINT);
  EXPECT_EQ(log.contents(), expectedLog("Control-C send"));
}

TEST(SignalHandlerTest, RestoringRunsAPendingInterruptFirst) {
  TempFile log;
  const ChildOutcome outcome = runComputation(log, [] {
    raise(SIGINT);
    restoreSignalHandlers();
    _exit(99);
  });
  EXPECT_EQ(outcome.exitCode, SIGINT);
  EXPECT_EQ(log.contents(), expectedLog("Control-C send"));
}

void markerHandler(int) {}

TEST(SignalHandlerTest, RestorePutsThePreviousHandlersBack) {
  const ChildOutcome outcome = runChild([] {
    for (const HandledSignal& handled : kHandled) signal(handled.number, markerHandler);
    installSignalHandlers();
    for (const HandledSignal& handled : kHandled) {
      struct sigaction current {};
      sigaction(handled.number, nullptr, &current);
      if (current.sa_handler == markerHandler) _exit(10);
    }
    restoreSignalHandlers();
    for (const HandledSignal& handled : kHandled) {
      struct sigaction current {};
      sigaction(handled.number, nullptr, &current);
      if (current.sa_handler != markerHandler) _exit(11);
    }
    // With the previous handlers back a signal no longer ends the run.
    raise(SIGINT);
    _exit(0);
  });
  EXPECT_TRUE(outcome.exited);
  EXPECT_EQ(outcome.exitCode, 0);
}

}  // namespace
}  // namespace karnet
