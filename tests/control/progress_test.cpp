// Progress arithmetic (percentage, speed, time left), and the host that shows it
// on a terminal or without one: what it shows, how the user cancels, and that
// the terminal is always given back as it was.
#include "control/progress.h"

#include <gtest/gtest.h>
#include <pty.h>
#include <signal.h>
#include <sys/ioctl.h>
#include <termios.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstring>
#include <stdexcept>
#include <string>
#include <thread>
#include <tuple>

#include "child_process.h"
#include "control/host.h"
#include "control/signals.h"
#include "support/run_error.h"

namespace karnet {
namespace {

using namespace karnet::testing;

std::int64_t fakeNow = 1'700'000'000;

TEST(ProgressTest, ShowsPercentTimeLeftAndSpeedWithoutDividingByZero) {
  progressSetClock([] { return fakeNow; });
  const std::pair<void (*)(), std::tuple<int, int, int>> steps[] = {
      // 50 units in 10 s: 5/s, 150 left.
      {[] { progressStart(200); fakeNow += 10; progressReport(50); }, {25, 30, 5}},
      // 199/200 = 99.5 %, 13.27/s, 0.075 s left: all truncated.
      {[] { fakeNow += 5; progressReport(199); }, {99, 0, 13}},
      // No whole second yet, no total, units done against a total of nothing.
      {[] { progressStart(100); progressReport(10); }, {10, 0, 0}},
      {[] { progressStart(0); progressReport(0); }, {0, 0, 0}},
      // Grids count every node of the local grid: 10 * (20 * 5 + 1) = 1010 units, one done.
      {[] { progressStartGrid(10, 20, 4); fakeNow += 1; progressReportGrid(0, 0, 0); },
       {0, 1009, 1}},
      // (10 * 2 + 3) * 20 + 5 + 1 = 466 units.
      {[] { progressReportGrid(3, 5, 2); }, {46, 1, 466}},
      // Beyond 32 bits: (1e5 * 10 + 99999) * 1e5 + 99999 + 1 = 1.1e11 of 1.100001e11 units.
      {[] { progressStartGrid(100000, 100000, 10); fakeNow += 1000;
            progressReportGrid(99999, 99999, 10); }, {99, 0, 110000000}},
  };
  for (const auto& [step, expected] : steps) {
    step();
    const HostDisplayState state = apvDisplayState();
    EXPECT_EQ(std::tuple(state.percent, state.timeLeft, state.speed), expected);
  }
  EXPECT_EQ(progressCheckCancel(), 0);  // without a host no cancel is ever asked for
  progressSetClock(nullptr);
}

TEST(WorkProgressTest, WorkersCountAndTheDrivingThreadShowsAndRethrowsTheFirstError) {
  progressSetClock([] { return fakeNow; });
  WorkProgress progress(400);
  const int before = apvDisplayState().percent;
  std::thread worker([&progress] {
    progress.add(100);
    progress.poll();  // not the driving thread: shows nothing
  });
  worker.join();
  EXPECT_EQ(apvDisplayState().percent, before);
  progress.add(100);
  progress.poll();
  EXPECT_EQ(apvDisplayState().percent, 50);
  EXPECT_FALSE(progress.stopped());
  EXPECT_NO_THROW(progress.finish());

  // The error of the earliest layer wins, whatever order the workers fail in.
  progress.fail(std::make_exception_ptr(std::runtime_error("layer 7")), 7);
  progress.fail(std::make_exception_ptr(std::runtime_error("layer 3")), 3);
  progress.fail(std::make_exception_ptr(std::runtime_error("layer 5")), 5);
  EXPECT_TRUE(progress.stopped());
  try {
    progress.finish();
    ADD_FAILURE() << "no error rethrown";
  } catch (const std::runtime_error& error) {
    EXPECT_STREQ(error.what(), "layer 3");
  }
  progressSetClock(nullptr);
}

TEST(WorkProgressTest, AnInterruptSeenByTheDrivingThreadStopsTheWorkers) {
  ChildOutcome outcome = runChild([] {
    installSignalHandlers();
    WorkProgress progress(10);
    raise(SIGINT);
    std::thread worker([&progress] { progress.poll(); });
    worker.join();
    if (progress.stopped()) _exit(3);  // only the driving thread asks
    progress.poll();
    if (!progress.stopped()) _exit(4);
    try {
      progress.finish();
    } catch (const RunError& error) {
      _exit(error.exitCode() == SIGINT && error.message() == "Control-C send" ? 0 : 5);
    }
    _exit(6);
  });
  EXPECT_EQ(outcome.exitCode, 0);
}

TEST(WorkProgressTest, TheDrivingThreadKeepsAskingWhileOthersFinishTheirWork) {
  // A worker that works until told to stop: only the driving thread, waiting
  // for it, can see the interrupt and stop it.
  ChildOutcome outcome = runChild([] {
    installSignalHandlers();
    WorkProgress progress(10);
    std::thread worker([&progress] {
      while (!progress.stopped()) std::this_thread::sleep_for(std::chrono::milliseconds(1));
      progress.itemDone();
    });
    raise(SIGINT);
    progress.watchUntilDone(1);
    worker.join();
    try {
      progress.finish();
    } catch (const RunError& error) {
      _exit(error.exitCode() == SIGINT ? 0 : 5);
    }
    _exit(6);
  });
  EXPECT_EQ(outcome.exitCode, 0);
}

// One phase of work in twenty steps, as the progress layer reports it.
void reportSteps() {
  apvStatus("Interpolating ...");
  for (int percent = 0; percent <= 100; percent += 5) {
    apvProgress(percent);
    apvTimeLeft(100 - percent);
    apvSpeed(7);
  }
}

TEST(HostTest, WithoutTerminalPlainModeShowsNothingAndHostModeEveryTenthLine) {
  ChildOutcome outcome = runChild([] {
    reportSteps();
    if (apvCancel() != 0) _exit(3);
    apvShutdown();
  });
  EXPECT_EQ(outcome.exitCode, 0);
  EXPECT_EQ(outcome.output, "");
  outcome = runChild([] { apvStart("karnet", [] { reportSteps(); return 0; }); });
  EXPECT_EQ(outcome.exitCode, 0);
  // The status line, then one line at 0 %, 10 % ... 100 %.
  EXPECT_TRUE(outcome.output.starts_with("Interpolating ...\n")) << outcome.output;
  EXPECT_TRUE(outcome.output.ends_with("\nInterpolating ...   90%  time left 0:00:10  speed 7/s\n"
                                       "Interpolating ...  100%  time left 0:00:00  speed 7/s\n"))
      << outcome.output;
  EXPECT_EQ(std::count(outcome.output.begin(), outcome.output.end(), '\n'), 12) << outcome.output;
}

// A pseudo terminal, 100 columns wide and showing output exactly as written,
// as the child's standard input, standard error and controlling terminal.
class TerminalTest : public ::testing::Test {
 protected:
  void SetUp() override {
    const winsize size{24, 100, 0, 0};
    ASSERT_EQ(openpty(&master_, &slave_, nullptr, nullptr, &size), 0);
    termios raw = settings();
    raw.c_oflag &= ~static_cast<tcflag_t>(OPOST);
    tcsetattr(slave_, TCSANOW, &raw);
  }
  void TearDown() override {
    close(master_);
    close(slave_);
  }
  termios settings() const {
    termios now{};
    tcgetattr(slave_, &now);
    return now;
  }
  // Runs body on the terminal; whenReady is called once the child has written "ready".
  ChildOutcome run(const std::function<void()>& body,
                   const std::function<void(pid_t)>& whenReady = {}) {
    const auto onOutput = [&, ready = false](pid_t child, const std::string& output) mutable {
      if (!ready && (ready = output.find("ready\n") != std::string::npos) && whenReady) {
        whenReady(child);
      }
    };
    return runChild(body, {.terminal = master_, .onOutput = onOutput});
  }
  int master_ = -1;
  int slave_ = -1;
};

// Returns once a cancel is asked for.
int waitForCancel() {
  if (apvCancel() != 0) _exit(3);
  std::fputs("ready\n", stderr);
  for (int i = 0; i < 500; ++i, usleep(10000)) {
    if (apvCancel() != 0) return 0;
  }
  _exit(4);
}

TEST_F(TerminalTest, KeysAndSignalsCancelAndTheTerminalIsRestoredHoweverTheRunEnds) {
  const termios initial = settings();
  const auto comparable = [](const termios& t) {
    return std::tuple(t.c_lflag, t.c_cc[VMIN], t.c_cc[VTIME]);
  };
  const struct {
    const char* keys;  // typed when the computation is ready, or
    int signal;        // sent then; an ending signal keeps its outcome: the process ends by it
  } cases[] = {
      {"xq", 0},  // other keys do nothing; q cancels without Enter
      {"", SIGTERM},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(::testing::Message() << c.keys << c.signal);
    bool keyMode = false;
    const ChildOutcome outcome = run(
        [&] {
          if (c.signal != 0) signal(c.signal, SIG_DFL);
          apvStart("karnet", waitForCancel);
        },
        [&](pid_t child) {
          keyMode = (settings().c_lflag & (ICANON | ECHO)) == 0;
          if (c.signal != 0) kill(child, c.signal);
          EXPECT_EQ(write(master_, c.keys, std::strlen(c.keys)), std::strlen(c.keys));
        });
    EXPECT_EQ(outcome.exitCode, c.signal != 0 ? -1 : 0);
    EXPECT_EQ(outcome.signal, c.signal);
    EXPECT_TRUE(keyMode);
    EXPECT_EQ(comparable(settings()), comparable(initial));
  }
}

TEST_F(TerminalTest, OneLineIsRewrittenInPlaceAndClearedAtTheEnd) {
  const std::string out = run([] { apvStart("karnet", [] { reportSteps(); return 0; }); }).output;
  EXPECT_EQ(out.find('\n'), std::string::npos) << out;
  EXPECT_NE(out.find("\rInterpolating ... [##########----------]  50%  0:00:50 left  7/s\x1b[K"),
            std::string::npos) << out;
  // Every report is drawn once.
  EXPECT_EQ(std::count(out.begin(), out.end(), '%'), 21) << out;
  EXPECT_TRUE(out.ends_with("\r\x1b[K")) << out;
}

TEST_F(TerminalTest, LinesNeverWrapAndMessagesMoveTheProgressLineAside) {
  std::string text = run([] {
    apvStatus(std::string(150, 's').c_str());
    apvProgress(10);
    apvShutdown();
  }).output;
  EXPECT_TRUE(text.ends_with("\r\x1b[K")) << text;  // cleared in plain mode too
  // The longest text between carriage returns, without the clear-to-end sequences.
  for (std::size_t at; (at = text.find("\x1b[K")) != std::string::npos;) text.erase(at, 3);
  std::size_t longest = 0, length = 0;
  for (char c : text) longest = std::max(longest, length = c == '\r' ? 0 : length + 1);
  EXPECT_EQ(longest, 99u) << text;  // one column less than the terminal

  EXPECT_EQ(run([] {
              apvStatus("Saving data ...");
              apvMessage("\nUnable to allocate memory \n", "karnet", 16);
              apvMessage("Cancel computation", "", 4);
            }).output,
            "\rSaving data ...\x1b[K\r\x1b[Kkarnet: Unable to allocate memory \n"
            "Cancel computation\n");
}

}  // namespace
}  // namespace karnet
