// The progress host on a terminal and without one: what it shows, how the user
// cancels, and that the terminal is always given back as it was.
#include "control/host.h"

#include <gtest/gtest.h>
#include <pty.h>
#include <sys/ioctl.h>
#include <signal.h>
#include <termios.h>
#include <unistd.h>

#include <algorithm>
#include <string>

#include "child_process.h"
#include "control/termination.h"

namespace karnet {
namespace {

using karnet::testing::ChildOutcome;
using karnet::testing::ChildSetup;
using karnet::testing::runChild;

int countOf(const std::string& text, const std::string& part) {
  int count = 0;
  for (std::size_t at = text.find(part); at != std::string::npos; at = text.find(part, at + 1)) {
    ++count;
  }
  return count;
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

int computationInSteps() {
  reportSteps();
  return 0;
}

TEST(HostTest, PlainModeWithoutTerminalShowsNothingAndNeverCancels) {
  const ChildOutcome outcome = runChild([] {
    reportSteps();
    if (apvCancel() != 0) _exit(3);
    apvShutdown();
  });
  EXPECT_EQ(outcome.exitCode, 0);
  EXPECT_EQ(outcome.output, "");
}

TEST(HostTest, HostModeWithoutTerminalWritesStatusAndEveryTenth) {
  const ChildOutcome outcome = runChild([] { apvStart("karnet", computationInSteps); });
  EXPECT_EQ(outcome.exitCode, 0);
  const std::string& out = outcome.output;
  EXPECT_EQ(out.substr(0, 18), "Interpolating ...\n") << out;
  EXPECT_EQ(countOf(out, "%"), 11) << out;
  EXPECT_EQ(countOf(out, "\n"), 12) << out;
  EXPECT_NE(out.find("Interpolating ...   40%  time left 0:01:00  speed 7/s\n"), std::string::npos)
      << out;
  EXPECT_NE(out.find("Interpolating ...  100%  time left 0:00:00  speed 7/s\n"), std::string::npos)
      << out;
  EXPECT_EQ(out.find("45%"), std::string::npos) << out;
  EXPECT_EQ(out.find('\r'), std::string::npos) << out;
}

// How long waitForCancel waits, in steps of 10 ms.
int waitSteps = 500;

int waitForCancel() {
  if (apvCancel() != 0) _exit(3);
  std::fputs("ready\n", stderr);
  for (int i = 0; i < waitSteps; ++i) {
    if (apvCancel() != 0) {
      std::fputs("cancelled\n", stderr);
      return 0;
    }
    usleep(10000);
  }
  _exit(4);
}

TEST(HostTest, SignalUsr1AsksForCancel) {
  ChildSetup setup;
  setup.onOutput = [](pid_t child, const std::string& output) {
    if (output == "ready\n") kill(child, SIGUSR1);
  };
  const ChildOutcome outcome = runChild([] { apvStart("karnet", waitForCancel); }, setup);
  EXPECT_EQ(outcome.exitCode, 0);
  EXPECT_EQ(outcome.output, "ready\ncancelled\n");
}

// A pseudo terminal for the child's standard input or error.
class TerminalTest : public ::testing::Test {
 protected:
  void SetUp() override {
    ASSERT_EQ(openpty(&master_, &slave_, nullptr, nullptr, nullptr), 0);
    ASSERT_EQ(tcgetattr(slave_, &initial_), 0);
  }
  void TearDown() override {
    close(master_);
    close(slave_);
  }

  bool keyModeOn() {
    termios now{};
    tcgetattr(slave_, &now);
    return (now.c_lflag & (ICANON | ECHO)) == 0;
  }
  bool settingsAsInitially() {
    termios now{};
    tcgetattr(slave_, &now);
    return now.c_lflag == initial_.c_lflag && now.c_cc[VMIN] == initial_.c_cc[VMIN] &&
           now.c_cc[VTIME] == initial_.c_cc[VTIME];
  }

  int master_ = -1;
  int slave_ = -1;
  termios initial_{};
};

TEST_F(TerminalTest, KeyQCancelsAndTheTerminalIsRestored) {
  ChildSetup setup;
  setup.stdinFd = slave_;
  setup.controllingTerminal = true;
  bool keyModeWhileRunning = false;
  setup.onOutput = [&](pid_t, const std::string& output) {
    if (output != "ready\n") return;
    keyModeWhileRunning = keyModeOn();
    // Other keys do nothing; q cancels without Enter.
    ASSERT_EQ(write(master_, "xq", 2), 2);
  };
  const ChildOutcome outcome = runChild([] { apvStart("karnet", waitForCancel); }, setup);
  EXPECT_EQ(outcome.exitCode, 0);
  EXPECT_EQ(outcome.output, "ready\ncancelled\n");
  EXPECT_TRUE(keyModeWhileRunning);
  EXPECT_TRUE(settingsAsInitially());
}

int endRunWhenReady() {
  std::fputs("ready\n", stderr);
  for (int i = 0; i < 500 && apvCancel() == 0; ++i) usleep(10000);
  exitRun(apvCancel() != 0 ? 0 : 5);
}

TEST_F(TerminalTest, TerminalIsRestoredWhenTheRunEnds) {
  ChildSetup setup;
  setup.stdinFd = slave_;
  setup.controllingTerminal = true;
  setup.onOutput = [&](pid_t, const std::string& output) {
    if (output == "ready\n") {
      ASSERT_EQ(write(master_, "Q", 1), 1);
    }
  };
  const ChildOutcome outcome = runChild([] { apvStart("karnet", endRunWhenReady); }, setup);
  EXPECT_EQ(outcome.exitCode, 0);
  EXPECT_TRUE(settingsAsInitially());
}

int sleepWhenReady() {
  std::fputs("ready\n", stderr);
  for (;;) pause();
}

TEST_F(TerminalTest, TerminalIsRestoredWhenASignalEndsTheProcess) {
  for (int number : {SIGTERM, SIGINT, SIGHUP}) {
    ChildSetup setup;
    setup.stdinFd = slave_;
    setup.controllingTerminal = true;
    bool keyModeWhileRunning = false;
    setup.onOutput = [&](pid_t child, const std::string& output) {
      if (output != "ready\n") return;
      keyModeWhileRunning = keyModeOn();
      kill(child, number);
    };
    const ChildOutcome outcome = runChild(
        [number] {
          signal(number, SIG_DFL);
          apvStart("karnet", sleepWhenReady);
        },
        setup);
    // The signal keeps its own outcome: the process ends by it.
    EXPECT_FALSE(outcome.exited) << number;
    EXPECT_EQ(outcome.signal, number);
    EXPECT_TRUE(keyModeWhileRunning) << number;
    EXPECT_TRUE(settingsAsInitially()) << number;
  }
}

TEST_F(TerminalTest, StandardInputThatIsNoTerminalIsLeftAlone) {
  int fds[2];
  ASSERT_EQ(pipe(fds), 0);
  ChildSetup setup;
  setup.stdinFd = fds[0];
  setup.onOutput = [&](pid_t, const std::string&) { ASSERT_EQ(write(fds[1], "q", 1), 1); };
  // Only a key typed at a terminal cancels: the child waits its full time.
  const ChildOutcome outcome = runChild(
      [] {
        waitSteps = 50;
        apvStart("karnet", waitForCancel);
      },
      setup);
  close(fds[0]);
  close(fds[1]);
  EXPECT_EQ(outcome.exitCode, 4);
}

class TerminalDisplayTest : public TerminalTest {
 protected:
  void SetUp() override {
    TerminalTest::SetUp();
    // Output exactly as written (no newline translation), 100 columns wide.
    termios raw = initial_;
    raw.c_oflag &= ~static_cast<tcflag_t>(OPOST);
    tcsetattr(slave_, TCSANOW, &raw);
    winsize size{};
    size.ws_row = 24;
    size.ws_col = 100;
    ioctl(slave_, TIOCSWINSZ, &size);
  }

  ChildOutcome run(const std::function<void()>& body) {
    ChildSetup setup;
    setup.stderrFd = slave_;
    setup.outputFd = master_;
    return runChild(body, setup);
  }
};

TEST_F(TerminalDisplayTest, OneLineIsRewrittenInPlaceAndClearedAtTheEnd) {
  const ChildOutcome outcome = run([] { apvStart("karnet", computationInSteps); });
  EXPECT_EQ(outcome.exitCode, 0);
  const std::string& out = outcome.output;
  EXPECT_EQ(out.find('\n'), std::string::npos) << out;
  EXPECT_EQ(out.substr(0, 18), "\rInterpolating ...") << out;
  EXPECT_NE(out.find("\rInterpolating ... [" + std::string(20, '-') + "]   0%  0:01:40 left  7/s"),
            std::string::npos)
      << out;
  EXPECT_NE(out.find("\rInterpolating ... [##########----------]  50%  0:00:50 left  7/s\x1b[K"),
            std::string::npos)
      << out;
  EXPECT_NE(out.find("[" + std::string(20, '#') + "] 100%  0:00:00 left  7/s"), std::string::npos)
      << out;
  // Every report is drawn once, with the values of that report.
  EXPECT_EQ(countOf(out, "%"), 21) << out;
  EXPECT_EQ(out.substr(out.size() - 4), "\r\x1b[K") << out;
}

TEST_F(TerminalDisplayTest, PlainModeDrawsTheSameLine) {
  const ChildOutcome outcome = run([] {
    reportSteps();
    apvShutdown();
  });
  EXPECT_NE(outcome.output.find("[##########----------]  50%"), std::string::npos);
  EXPECT_EQ(outcome.output.substr(outcome.output.size() - 4), "\r\x1b[K");
}

TEST_F(TerminalDisplayTest, LinesNeverWrap) {
  const ChildOutcome outcome = run([] {
    apvStatus(std::string(150, 's').c_str());
    apvProgress(10);
    apvTimeLeft(1);
    apvSpeed(1);
    apvShutdown();
  });
  // The text between carriage returns, without the clear-to-end sequences.
  std::string text = outcome.output;
  for (std::size_t at; (at = text.find("\x1b[K")) != std::string::npos;) text.erase(at, 3);
  std::size_t longest = 0;
  std::size_t lines = 0;
  for (std::size_t begin = 0, end; begin < text.size(); begin = end + 1) {
    end = text.find('\r', begin);
    if (end == std::string::npos) end = text.size();
    longest = std::max(longest, end - begin);
    if (end > begin) ++lines;
  }
  EXPECT_EQ(lines, 2u) << outcome.output;
  EXPECT_EQ(longest, 99u) << outcome.output;  // one column less than the terminal
}

TEST_F(TerminalDisplayTest, MessagesMoveTheProgressLineAside) {
  const ChildOutcome outcome = run([] {
    apvStatus("Saving data ...");
    apvMessage("\nUnable to allocate memory \n", "karnet", 16);
    apvMessage("Cancel computation", "", 4);
  });
  EXPECT_EQ(outcome.output,
            "\rSaving data ...\x1b[K\r\x1b[Kkarnet: Unable to allocate memory \n"
            "Cancel computation\n");
}

}  // namespace
}  // namespace karnet
