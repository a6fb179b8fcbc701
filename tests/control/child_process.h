// Runs a piece of the program in a child process, with its standard input and
// error streams where a test wants them, and collects how it ended.
#ifndef KARNET_TESTS_CONTROL_CHILD_PROCESS_H_
#define KARNET_TESTS_CONTROL_CHILD_PROCESS_H_

#include <sys/types.h>

#include <cstdio>
#include <functional>
#include <string>

namespace karnet::testing {

struct ChildOutcome {
  int exitCode = -1;   // -1: it did not end through exit
  int signal = 0;      // the signal that ended it, if one did
  std::string output;  // what it wrote on its standard error stream
};

struct ChildSetup {
  int stdinFd = -1;  // the child's standard input; -1 keeps the test's own
  // The master side of a pseudo terminal that becomes the child's controlling
  // terminal, standard input and standard error; -1: standard error is a pipe.
  int terminal = -1;
  // Called in the test's process whenever more output has arrived.
  std::function<void(pid_t child, const std::string& outputSoFar)> onOutput = nullptr;
};

// Runs body in a forked child; a body that returns ends the child with code 0.
// A child still running after 15 seconds is killed.
ChildOutcome runChild(const std::function<void()>& body, const ChildSetup& setup = {});

// A file under /tmp that a child writes (a log, say) and the test reads back.
struct TempFile {
  TempFile();
  ~TempFile() { std::remove(path.c_str()); }
  std::string contents() const;
  std::string path;
};

// The run-time report block, for a run that took no measurable CPU time.
std::string reportBlock(const char* completion);

// The program's base name as the C library saw it at start, without extension.
std::string programName();

}  // namespace karnet::testing

#endif  // KARNET_TESTS_CONTROL_CHILD_PROCESS_H_
