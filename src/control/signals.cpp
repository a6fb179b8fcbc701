// Turning crashes and interrupts into an orderly end of the run.
#include "control/signals.h"

#include <sys/time.h>

#include <atomic>
#include <csignal>
#include <cstdint>

#include "control/termination.h"
#include "support/run_error.h"

namespace karnet {
namespace {

struct HandledSignal {
  int number;
  const char* message;
};

// Installed and restored in this order.
constexpr HandledSignal kHandledSignals[] = {
    {SIGFPE, "Floating point exception"}, {SIGILL, "Illegal instruction"},
    {SIGINT, "Control-C send"},           {SIGSEGV, "Illegal storage access"},
    {SIGTERM, "Termination reques"},
};
constexpr int kHandledCount = sizeof kHandledSignals / sizeof kHandledSignals[0];
constexpr long kInterruptGraceSeconds = 1;
constexpr std::size_t kAlternateStackSize = 64 * 1024;

struct SavedHandlers {
  bool installed = false;
  struct sigaction previous[kHandledCount];
  struct sigaction previousAlarm;
  stack_t previousStack;
};

SavedHandlers saved;
// A SIGSEGV from a stack overflow needs a stack of its own to run the handler on.
alignas(16) unsigned char alternateStack[kAlternateStackSize];

// The interrupt waiting for its fatal path, and whether that path has started.
// Lock-free atomics: the handlers may run on any of the run's threads.
std::atomic<int> pendingSignal{0};
std::atomic<int> pendingClaimed{0};
static_assert(std::atomic<int>::is_always_lock_free);

const char* messageFor(int number) {
  for (const HandledSignal& handled : kHandledSignals) {
    if (handled.number == number) return handled.message;
  }
  return "";
}

void setAlarm(long seconds) {
  itimerval timer{};
  timer.it_value.tv_sec = seconds;
  setitimer(ITIMER_REAL, &timer, nullptr);
}

void faultHandler(int number) { fatalErrorInSignal(messageFor(number), number); }

// Ends the run from the signal context for the pending interrupt, unless the
// main code has already taken it up or the run is ending anyway.
void endForPendingNow() {
  if (runEnding() || pendingClaimed.exchange(1) != 0) return;
  const int number = pendingSignal;
  fatalErrorInSignal(messageFor(number), number);
}

void interruptHandler(int number) {
  if (pendingSignal != 0) {
    endForPendingNow();
    return;
  }
  pendingSignal = number;
  setAlarm(kInterruptGraceSeconds);
}

void alarmHandler(int) {
  if (pendingSignal != 0) endForPendingNow();
}

void install(int number, void (*handler)(int), int flags, struct sigaction* previous) {
  struct sigaction action{};
  action.sa_handler = handler;
  action.sa_flags = flags;
  sigemptyset(&action.sa_mask);
  sigaction(number, &action, previous);
}

}  // namespace

void installSignalHandlers() {
  if (saved.installed) return;
  stack_t stack{};
  stack.ss_sp = alternateStack;
  stack.ss_size = sizeof alternateStack;
  stack.ss_flags = 0;
  sigaltstack(&stack, &saved.previousStack);

  pendingSignal = 0;
  pendingClaimed = 0;
  for (int i = 0; i < kHandledCount; ++i) {
    const int number = kHandledSignals[i].number;
    if (number == SIGINT || number == SIGTERM) {
      install(number, interruptHandler, SA_RESTART, &saved.previous[i]);
    } else {
      // A second fault inside the handler gets the default action.
      install(number, faultHandler, SA_ONSTACK | SA_RESETHAND, &saved.previous[i]);
    }
  }
  install(SIGALRM, alarmHandler, SA_RESTART, &saved.previousAlarm);
  saved.installed = true;
}

void restoreSignalHandlers() {
  if (!saved.installed) return;
  handlePendingSignal();
  setAlarm(0);
  sigaction(SIGALRM, &saved.previousAlarm, nullptr);
  for (int i = 0; i < kHandledCount; ++i) {
    sigaction(kHandledSignals[i].number, &saved.previous[i], nullptr);
  }
  sigaltstack(&saved.previousStack, nullptr);
  saved.installed = false;
}

void handlePendingSignal() {
  if (pendingSignal == 0 || pendingClaimed.exchange(1) != 0) return;
  setAlarm(0);
  const std::int32_t number = pendingSignal;
  throw RunError::fatal(messageFor(number), number);
}

}  // namespace karnet
