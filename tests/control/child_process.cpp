#include "child_process.h"

#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <fstream>
#include <iterator>

namespace karnet::testing {

ChildOutcome runChild(const std::function<void()>& body, const ChildSetup& setup) {
  int fds[2] = {-1, -1};  // the child's standard error and where the test reads it
  if (setup.terminal < 0 && pipe(fds) != 0) return {};
  std::fflush(nullptr);
  const pid_t child = fork();
  if (child == 0) {
    if (setup.terminal >= 0) {
      setsid();  // opened by a session leader, the terminal becomes its controlling one
      dup2(fds[1] = open(ptsname(setup.terminal), O_RDWR), STDIN_FILENO);
    }
    if (setup.stdinFd >= 0) dup2(setup.stdinFd, STDIN_FILENO);
    dup2(fds[1], STDERR_FILENO);
    body();
    std::fflush(nullptr);
    _exit(0);
  }
  if (setup.terminal < 0) close(fds[1]);
  pollfd output{setup.terminal < 0 ? fds[0] : setup.terminal, POLLIN, 0};
  const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(15);
  ChildOutcome outcome;
  int status = 0;
  for (bool ended = false; !ended;) {
    ended = waitpid(child, &status, WNOHANG) == child;
    if (!ended && std::chrono::steady_clock::now() > deadline) {
      kill(child, SIGKILL);
      ended = waitpid(child, &status, 0) == child;
    }
    // All that has arrived; once the child has ended, all it wrote.
    char buffer[4096];
    ssize_t count = -1;
    while (poll(&output, 1, ended ? 0 : 20) > 0 && (count = read(output.fd, buffer, 4096)) > 0) {
      outcome.output.append(buffer, static_cast<std::size_t>(count));
      if (setup.onOutput) setup.onOutput(child, outcome.output);
    }
    if (count == 0 && !ended) usleep(20000);  // at the end of a pipe, before the child is gone
  }
  if (setup.terminal < 0) close(fds[0]);
  outcome.exitCode = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  outcome.signal = WIFSIGNALED(status) ? WTERMSIG(status) : 0;
  return outcome;
}

TempFile::TempFile() {
  char name[] = "/tmp/karnet_testXXXXXX";
  close(mkstemp(name));
  path = name;
}

std::string TempFile::contents() const {
  std::ifstream in(path);
  return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

std::string reportBlock(const char* completion) {
  return std::string("\n--------------- RUN TIME INFORMATION --------------\n--\n") +
         "-- CPU time        : 0 [s]\n--\n-- Completion code : " + completion +
         "\n--\n---------------------------------------------------\n";
}

std::string programName() {
  const std::string name = program_invocation_short_name;
  return name.substr(0, name.rfind('.'));
}

}  // namespace karnet::testing
