#include "child_process.h"

#include <poll.h>
#include <signal.h>
#include <sys/ioctl.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <sstream>

namespace karnet::testing {
namespace {

long long nowMs() {
  timespec now{};
  clock_gettime(CLOCK_MONOTONIC, &now);
  return now.tv_sec * 1000LL + now.tv_nsec / 1000000;
}

// Reads what is available now; false at end of input.
bool readAvailable(int fd, std::string& output, int waitMs) {
  pollfd input{fd, POLLIN, 0};
  if (poll(&input, 1, waitMs) <= 0) return true;
  char buffer[4096];
  const ssize_t count = read(fd, buffer, sizeof buffer);
  if (count > 0) {
    output.append(buffer, static_cast<std::size_t>(count));
    return true;
  }
  return count < 0 && errno == EINTR;
}

}  // namespace

ChildOutcome runChild(const std::function<void()>& body, const ChildSetup& setup) {
  int pipeFds[2] = {-1, -1};
  int outputFd = setup.outputFd;
  if (setup.stderrFd < 0) {
    if (pipe(pipeFds) != 0) return {};
    outputFd = pipeFds[0];
  }
  std::fflush(nullptr);
  const pid_t child = fork();
  if (child == 0) {
    if (setup.controllingTerminal) {
      setsid();
      ioctl(setup.stdinFd >= 0 ? setup.stdinFd : setup.stderrFd, TIOCSCTTY, 0);
    }
    if (setup.stdinFd >= 0) dup2(setup.stdinFd, STDIN_FILENO);
    dup2(setup.stderrFd >= 0 ? setup.stderrFd : pipeFds[1], STDERR_FILENO);
    if (pipeFds[0] >= 0) {
      close(pipeFds[0]);
      close(pipeFds[1]);
    }
    body();
    std::fflush(nullptr);
    _exit(0);
  }
  if (pipeFds[1] >= 0) close(pipeFds[1]);

  ChildOutcome outcome;
  const long long deadline = nowMs() + setup.timeoutMs;
  int status = 0;
  bool ended = false;
  bool open = outputFd >= 0;
  while (!ended) {
    const std::size_t before = outcome.output.size();
    if (open) {
      open = readAvailable(outputFd, outcome.output, 20);
    } else {
      usleep(20000);
    }
    if (outcome.output.size() != before && setup.onOutput) setup.onOutput(child, outcome.output);
    ended = waitpid(child, &status, WNOHANG) == child;
    if (!ended && nowMs() > deadline) {
      outcome.timedOut = true;
      kill(child, SIGKILL);
      waitpid(child, &status, 0);
      ended = true;
    }
  }
  // What the child wrote just before it ended.
  while (open && outputFd >= 0) {
    const std::size_t before = outcome.output.size();
    open = readAvailable(outputFd, outcome.output, 0);
    if (outcome.output.size() == before) break;
  }
  if (pipeFds[0] >= 0) close(pipeFds[0]);

  if (WIFEXITED(status)) {
    outcome.exited = true;
    outcome.exitCode = WEXITSTATUS(status);
  } else if (WIFSIGNALED(status)) {
    outcome.signal = WTERMSIG(status);
  }
  return outcome;
}

TempFile::TempFile() {
  char name[] = "/tmp/karnet_testXXXXXX";
  const int fd = mkstemp(name);
  if (fd >= 0) close(fd);
  path_ = name;
}

TempFile::~TempFile() { std::remove(path_.c_str()); }

std::string TempFile::contents() const {
  std::ifstream in(path_);
  std::stringstream content;
  content << in.rdbuf();
  return content.str();
}

}  // namespace karnet::testing
