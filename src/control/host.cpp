// The progress host on a Linux terminal: the status line, the plain report
// lines, the message line and the cancel requests (key q, SIGUSR1).
//
// Everything is written with write(2) on the standard error stream so that the
// shutdown path can also run from a signal handler.
#include "control/host.h"

#include <poll.h>
#include <signal.h>
#include <sys/ioctl.h>
#include <termios.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>

namespace karnet {
namespace {

constexpr std::size_t kTextSize = 260;
constexpr int kBarWidth = 20;
constexpr int kDefaultWidth = 80;
// Updates that only change the time left or the speed redraw at most this often.
constexpr std::int64_t kRedrawIntervalNs = 100'000'000;
// The keyboard is looked at no more often than this: cancel checks come from
// the computing loops, many times per second.
constexpr std::int64_t kKeyPollIntervalNs = 50'000'000;
// Signals that would end the process before the run's own handlers are in
// place; with the keyboard taken they restore the terminal first.
constexpr int kEndingSignals[] = {SIGHUP, SIGINT,  SIGQUIT, SIGTERM, SIGABRT,
                                  SIGSEGV, SIGBUS, SIGFPE,  SIGILL};
constexpr char kClearLine[] = "\r\x1b[K";

struct Display {
  bool hostMode = false;
  bool terminalChecked = false;
  bool terminal = false;           // stderr is a terminal: one line rewritten in place
  volatile sig_atomic_t lineShown = 0;
  char status[kTextSize] = "";
  int percent = -1;                // -1: no report since the last status text
  int timeLeft = 0;
  int speed = 0;
  int lastTenth = -1;              // tenth of the work of the last plain report line
  bool tenthPending = false;
  bool percentChanged = false;     // the shown line lags behind the percentage
  std::int64_t lastDrawNs = 0;
};

struct Keyboard {
  bool active = false;             // stdin is a terminal switched to key-by-key input
  bool quitPressed = false;
  std::int64_t lastPollNs = 0;
  struct termios keyMode {};
};

Display display;
Keyboard keyboard;
struct termios savedTerminal {};
volatile sig_atomic_t terminalModified = 0;
// Set by SIGUSR1 on whatever thread it lands; read by the driving thread.
std::atomic<int> cancelSignalled{0};
volatile sig_atomic_t resumed = 0;

std::int64_t monotonicNs() {
  timespec now{};
  clock_gettime(CLOCK_MONOTONIC, &now);
  return std::int64_t{now.tv_sec} * 1'000'000'000 + now.tv_nsec;
}

void writeAll(const char* text, std::size_t length) {
  while (length > 0) {
    const ssize_t written = write(STDERR_FILENO, text, length);
    if (written < 0 && errno == EINTR) continue;
    if (written <= 0) return;
    text += written;
    length -= static_cast<std::size_t>(written);
  }
}

void writeText(const char* text) { writeAll(text, std::strlen(text)); }

bool terminalDisplay() {
  if (!display.terminalChecked) {
    display.terminalChecked = true;
    display.terminal = isatty(STDERR_FILENO) != 0;
  }
  return display.terminal;
}

bool plainLines() { return display.hostMode && !terminalDisplay(); }

int terminalWidth() {
  winsize size{};
  if (ioctl(STDERR_FILENO, TIOCGWINSZ, &size) == 0 && size.ws_col > 0) return size.ws_col;
  return kDefaultWidth;
}

// "h:mm:ss"; a negative estimate (more done than the total) has no meaning.
void formatDuration(char* buffer, std::size_t size, int seconds) {
  if (seconds < 0) {
    std::snprintf(buffer, size, "-:--:--");
    return;
  }
  std::snprintf(buffer, size, "%d:%02d:%02d", seconds / 3600, seconds / 60 % 60, seconds % 60);
}

void clearLine() {
  if (display.lineShown == 0) return;
  display.lineShown = 0;
  writeAll(kClearLine, sizeof kClearLine - 1);
}

void drawLine(bool force) {
  if (display.status[0] == '\0' && display.percent < 0) return;
  const std::int64_t now = monotonicNs();
  if (!force && display.lineShown != 0 && now - display.lastDrawNs < kRedrawIntervalNs) return;
  display.lastDrawNs = now;
  display.percentChanged = false;

  char line[512];
  int length = std::snprintf(line, sizeof line, "%s", display.status);
  if (display.percent >= 0) {
    char bar[kBarWidth + 1];
    const int filled = std::clamp(display.percent, 0, 100) * kBarWidth / 100;
    for (int i = 0; i < kBarWidth; ++i) bar[i] = i < filled ? '#' : '-';
    bar[kBarWidth] = '\0';
    char left[32];
    formatDuration(left, sizeof left, display.timeLeft);
    std::snprintf(line + length, sizeof line - static_cast<std::size_t>(length),
                  "%s[%s] %3d%%  %s left  %d/s", length > 0 ? " " : "", bar, display.percent,
                  left, display.speed);
  }
  // Never wider than the terminal, so that the line does not wrap and can be
  // rewritten in place.
  std::size_t visible = std::strlen(line);
  const auto width = static_cast<std::size_t>(terminalWidth());
  if (width > 1 && visible > width - 1) visible = width - 1;
  writeAll("\r", 1);
  writeAll(line, visible);
  writeAll(kClearLine + 1, sizeof kClearLine - 2);
  display.lineShown = 1;
}

void writeTenthLine() {
  display.tenthPending = false;
  char left[32];
  formatDuration(left, sizeof left, display.timeLeft);
  char line[kTextSize + 96];
  std::snprintf(line, sizeof line, "%s%s%3d%%  time left %s  speed %d/s\n", display.status,
                display.status[0] != '\0' ? "  " : "", display.percent, left, display.speed);
  writeText(line);
}

void flushTenthLine() {
  if (display.tenthPending) writeTenthLine();
}

void redraw(bool force) {
  if (terminalDisplay()) drawLine(force);
}

void restoreTerminal() {
  if (terminalModified == 0) return;
  terminalModified = 0;
  // Restoring from a background process group must not stop the process.
  struct sigaction ignore {};
  struct sigaction previous {};
  ignore.sa_handler = SIG_IGN;
  sigemptyset(&ignore.sa_mask);
  sigaction(SIGTTOU, &ignore, &previous);
  tcsetattr(STDIN_FILENO, TCSANOW, &savedTerminal);
  sigaction(SIGTTOU, &previous, nullptr);
}

bool inForeground() { return tcgetpgrp(STDIN_FILENO) == getpgrp(); }

void applyKeyMode() {
  if (tcsetattr(STDIN_FILENO, TCSANOW, &keyboard.keyMode) == 0) terminalModified = 1;
}

void cancelSignalHandler(int) { cancelSignalled = 1; }

void resumeHandler(int) { resumed = 1; }

// Puts the terminal back, then lets the signal take its default course.
void restoreAndReraise(int number) {
  apvShutdown();
  raise(number);
}

void installIfDefault(int number, void (*handler)(int), int flags) {
  struct sigaction current {};
  if (sigaction(number, nullptr, &current) != 0 || current.sa_handler != SIG_DFL) return;
  struct sigaction action {};
  action.sa_handler = handler;
  action.sa_flags = flags;
  sigemptyset(&action.sa_mask);
  sigaction(number, &action, nullptr);
}

// Switches a foreground terminal on stdin to unbuffered input without echo,
// so that a single q is seen at once and does not show on the display.
void takeKeyboard() {
  if (keyboard.active || isatty(STDIN_FILENO) == 0 || !inForeground()) return;
  if (tcgetattr(STDIN_FILENO, &savedTerminal) != 0) return;
  keyboard.keyMode = savedTerminal;
  keyboard.keyMode.c_lflag &= ~static_cast<tcflag_t>(ICANON | ECHO);
  keyboard.keyMode.c_cc[VMIN] = 0;
  keyboard.keyMode.c_cc[VTIME] = 0;
  for (int number : kEndingSignals) installIfDefault(number, restoreAndReraise, SA_RESETHAND);
  installIfDefault(SIGCONT, resumeHandler, SA_RESTART);
  applyKeyMode();
  keyboard.active = terminalModified != 0;
}

bool quitKeyPressed() {
  if (!keyboard.active || keyboard.quitPressed) return keyboard.quitPressed;
  const std::int64_t now = monotonicNs();
  if (keyboard.lastPollNs != 0 && now - keyboard.lastPollNs < kKeyPollIntervalNs) return false;
  keyboard.lastPollNs = now;
  // Reading the terminal from the background would stop the process.
  if (!inForeground()) return false;
  if (resumed != 0) {
    // Back from a stop: the shell may have reset the terminal meanwhile.
    resumed = 0;
    applyKeyMode();
  }
  pollfd input{STDIN_FILENO, POLLIN, 0};
  while (poll(&input, 1, 0) > 0 && (input.revents & POLLIN) != 0) {
    char keys[64];
    const ssize_t count = read(STDIN_FILENO, keys, sizeof keys);
    if (count <= 0) break;
    for (ssize_t i = 0; i < count; ++i) {
      if (keys[i] == 'q' || keys[i] == 'Q') keyboard.quitPressed = true;
    }
  }
  return keyboard.quitPressed;
}

}  // namespace

int apvStart(const char* /*programName*/, int (*callback)()) {
  display.hostMode = true;
  display.terminalChecked = false;
  cancelSignalled = 0;
  struct sigaction action {};
  action.sa_handler = cancelSignalHandler;
  action.sa_flags = SA_RESTART;
  sigemptyset(&action.sa_mask);
  sigaction(SIGUSR1, &action, nullptr);
  takeKeyboard();
  static bool exitHookSet = false;
  if (!exitHookSet) {
    exitHookSet = true;
    std::atexit(apvShutdown);
  }
  if (callback != nullptr) callback();
  apvShutdown();
  return 0;
}

int apvStatus(const char* text) {
  flushTenthLine();
  // Where the display goes is looked at anew with each phase.
  display.terminalChecked = false;
  std::snprintf(display.status, sizeof display.status, "%s", text != nullptr ? text : "");
  display.percent = -1;
  display.lastTenth = -1;
  if (plainLines()) {
    writeText(display.status);
    writeAll("\n", 1);
  }
  redraw(true);
  return 0;
}

// A report comes as percentage, time left and speed, in this order; the line
// is drawn once the speed has arrived, so that it shows one report's values.
int apvProgress(int percent) {
  flushTenthLine();
  if (percent != display.percent) display.percentChanged = true;
  display.percent = percent;
  if (plainLines()) {
    const int tenth = std::clamp(percent, 0, 100) / 10;
    if (tenth != display.lastTenth) {
      display.lastTenth = tenth;
      display.tenthPending = true;
    }
  }
  return 0;
}

int apvTimeLeft(int seconds) {
  display.timeLeft = seconds;
  return 0;
}

int apvSpeed(int unitsPerSecond) {
  display.speed = unitsPerSecond;
  flushTenthLine();
  // A new percentage is shown at once, other changes at most every 0.1 s.
  redraw(display.percentChanged);
  return 0;
}

int apvCancel() {
  if (!display.hostMode) return 0;
  if (cancelSignalled != 0) return 1;
  return quitKeyPressed() ? 1 : 0;
}

void consoleMessage(const char* text, const char* caption) {
  flushTenthLine();
  clearLine();
  if (text == nullptr) text = "";
  // One line: the newlines that frame some messages in the log are left out.
  std::size_t begin = 0;
  std::size_t end = std::strlen(text);
  while (begin < end && (text[begin] == '\n' || text[begin] == '\r')) ++begin;
  while (end > begin && (text[end - 1] == '\n' || text[end - 1] == '\r')) --end;
  if (caption != nullptr && caption[0] != '\0') {
    writeText(caption);
    writeAll(": ", 2);
  }
  writeAll(text + begin, end - begin);
  writeAll("\n", 1);
}

int apvMessage(const char* text, const char* caption, int /*style*/) {
  consoleMessage(text, caption);
  return 0;
}

void apvShutdown() {
  clearLine();
  restoreTerminal();
}

HostDisplayState apvDisplayState() {
  return HostDisplayState{display.status, display.percent, display.timeLeft, display.speed};
}

}  // namespace karnet
