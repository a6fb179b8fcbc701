// Runs a piece of the program in a child process, with its standard input and
// error streams where a test wants them, and collects how it ended.
#ifndef KARNET_TESTS_CONTROL_CHILD_PROCESS_H_
#define KARNET_TESTS_CONTROL_CHILD_PROCESS_H_

#include <functional>
#include <string>

namespace karnet::testing {

struct ChildOutcome {
  bool exited = false;   // ended through exit with exitCode
  int exitCode = -1;
  int signal = 0;        // the signal that ended it, when it did not exit
  bool timedOut = false;
  std::string output;    // what it wrote on its standard error stream
};

struct ChildSetup {
  // The child's standard input; -1 keeps the test's own.
  int stdinFd = -1;
  // The child's standard error (a terminal, for instance) and the descriptor
  // the test reads it back from; both -1: a pipe.
  int stderrFd = -1;
  int outputFd = -1;
  // Makes the child a session leader with stdinFd or stderrFd as its
  // controlling terminal, so that it runs in the terminal's foreground.
  bool controllingTerminal = false;
  // Called in the test's process whenever more output has arrived.
  std::function<void(pid_t child, const std::string& outputSoFar)> onOutput;
  int timeoutMs = 15000;
};

// Runs body in a forked child; a body that returns ends the child with code 0.
ChildOutcome runChild(const std::function<void()>& body, const ChildSetup& setup = {});

// A file under /tmp that a child writes (a log, say) and the test reads back.
class TempFile {
 public:
  TempFile();
  ~TempFile();
  TempFile(const TempFile&) = delete;
  TempFile& operator=(const TempFile&) = delete;

  const std::string& path() const { return path_; }
  std::string contents() const;

 private:
  std::string path_;
};

}  // namespace karnet::testing

#endif  // KARNET_TESTS_CONTROL_CHILD_PROCESS_H_
