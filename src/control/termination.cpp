// The one way a run ends: the run-time report, the fatal message and the exit.
#include "control/termination.h"

#include <strings.h>
#include <unistd.h>

#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>

#include "control/host.h"
#include "control/log.h"
#include "control/ranks.h"
#include "support/run_error.h"

namespace karnet {
namespace {

constexpr int kErrorStyle = 16;
constexpr int kYesNoStyle = 4;
constexpr std::size_t kNameSize = 260;
constexpr std::size_t kLineSize = 256;

volatile std::sig_atomic_t endingStarted = 0;

bool environmentEquals(const char* name, const char* value) {
  const char* actual = std::getenv(name);
  return actual != nullptr && strcasecmp(actual, value) == 0;
}

// Writes the report, closes the log and restores the terminal. Inside a
// signal handler the log is only flushed: closing it would free its buffer,
// and the interrupted code may hold the heap's lock.
void finishRun(std::int32_t exitCode, bool inSignal) {
  endingStarted = 1;
  runTimeReport(exitCode);
  if (inSignal) {
    if (logStream != nullptr) std::fflush(logStream);
    logStream = nullptr;
  } else {
    logClose();
  }
  apvShutdown();
  // A run over several processes leaves its job together when all of them
  // agreed on the end; otherwise the launcher ends the others.
  if (!inSignal) ranksEnd(exitCode);
}

// Logs the message and shows it to the user unless the environment says not to.
void reportFatal(const char* message) {
  logWrite(message);
  if (environmentEquals("buildmode", "nigth")) return;
  if (environmentEquals("H84", "apv") || environmentEquals("H84", "win")) showMessage(message);
}

}  // namespace

void runTimeReport(std::int32_t completionCode) {
  char line[kLineSize];
  // clock() counts processor time in CLOCKS_PER_SEC ticks; whole seconds only.
  const long seconds = static_cast<long>(std::clock() / CLOCKS_PER_SEC);
  logWrite("\n");
  logWrite("--------------- RUN TIME INFORMATION --------------\n");
  logWrite("--\n");
  std::snprintf(line, sizeof line, "-- CPU time        : %d [s]\n", static_cast<int>(seconds));
  logWrite(line);
  logWrite("--\n");
  std::snprintf(line, sizeof line, "-- Completion code : %s\n",
                completionCode == 0 ? "Successful" : "Abnormal");
  logWrite(line);
  logWrite("--\n");
  logWrite("---------------------------------------------------\n");
}

bool runEnding() { return endingStarted != 0; }

void exitRun(std::int32_t exitCode) {
  if (endingStarted != 0) std::_Exit(exitCode);
  finishRun(exitCode, false);
  std::exit(exitCode);
}

void fatalError(const char* message, const std::int32_t* exitCode) {
  const std::int32_t code = exitCode != nullptr ? *exitCode : 1;
  if (endingStarted != 0) std::_Exit(code);
  endingStarted = 1;
  reportFatal(message);
  finishRun(code, false);
  std::exit(code);
}

void endRun(const RunError& error) {
  // The other processes of a run over several end the same way.
  ranksAnnounceEnd(error);
  if (!error.notice().empty()) {
    std::fputs(error.notice().c_str(), stderr);
    std::fflush(stderr);
  }
  switch (error.kind()) {
    case RunError::Kind::kFatal: {
      const std::int32_t code = error.exitCode();
      fatalError(error.message().c_str(), &code);
    }
    case RunError::Kind::kLogged:
      logWrite(error.message().c_str());
      break;
    case RunError::Kind::kMemory:
      std::fputs(error.message().c_str(), stderr);
      std::fflush(stderr);
      break;
    case RunError::Kind::kCancelled:
      apvMessage(error.message().c_str(), "", kYesNoStyle);
      break;
  }
  exitRun(error.exitCode());
}

void fatalErrorInSignal(const char* message, std::int32_t exitCode) {
  if (endingStarted == 0) {
    endingStarted = 1;
    reportFatal(message);
    finishRun(exitCode, true);
  }
  std::fflush(stderr);
  _exit(exitCode);
}

int showMessage(const char* text) {
  char caption[kNameSize] = "";
  moduleBaseName(caption, sizeof caption);
  if (text == nullptr) text = "";
  if (environmentEquals("H84", "apv")) return apvMessage(text, caption, kErrorStyle);
  // The message box of a terminal: one line on stderr that never waits for a key.
  consoleMessage(text, caption);
  return 1;
}

void moduleBaseName(char* buffer, std::size_t size) {
  if (buffer == nullptr || size == 0) return;
  char path[4096];
  const ssize_t length = readlink("/proc/self/exe", path, sizeof path - 1);
  if (length <= 0) return;
  path[length] = '\0';
  // A program file replaced while it runs is reported with this suffix.
  constexpr char kDeleted[] = " (deleted)";
  constexpr std::size_t kDeletedLength = sizeof kDeleted - 1;
  const auto pathLength = static_cast<std::size_t>(length);
  if (pathLength > kDeletedLength &&
      std::strcmp(path + pathLength - kDeletedLength, kDeleted) == 0) {
    path[pathLength - kDeletedLength] = '\0';
  }
  const char* slash = std::strrchr(path, '/');
  const char* name = slash != nullptr ? slash + 1 : path;
  std::size_t nameLength = std::strlen(name);
  const char* dot = std::strrchr(name, '.');
  if (dot != nullptr) nameLength = static_cast<std::size_t>(dot - name);
  if (nameLength >= size) nameLength = size - 1;
  std::memcpy(buffer, name, nameLength);
  buffer[nameLength] = '\0';
}

}  // namespace karnet
