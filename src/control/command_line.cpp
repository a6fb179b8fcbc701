// The run mode, the parameter file and the log file name from the arguments.
#include "control/command_line.h"

#include <strings.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <string>

namespace karnet {
namespace {

constexpr char kThreadsSwitch[] = "--threads";
constexpr std::size_t kThreadsSwitchLength = sizeof kThreadsSwitch - 1;
// More threads than this are certainly a mistake.
constexpr long kMaxThreads = 4096;

bool isHostModeSwitch(const char* argument) { return strcasecmp(argument, "//apv") == 0; }

bool isQuietSwitch(const char* argument) { return strcasecmp(argument, "--quiet") == 0; }

bool isThreadsSwitch(const char* argument) { return strcasecmp(argument, kThreadsSwitch) == 0; }

// "--threads=N".
bool isThreadsAssignment(const char* argument) {
  return strncasecmp(argument, kThreadsSwitch, kThreadsSwitchLength) == 0 &&
         argument[kThreadsSwitchLength] == '=';
}

bool isSkipped(const char* argument) {
  return argument[0] == '\0' || isHostModeSwitch(argument) || isQuietSwitch(argument) ||
         strcasecmp(argument, "-debug") == 0 || isThreadsAssignment(argument);
}

// A whole number 1..kMaxThreads, nothing else.
bool parseThreads(const char* text, int* threads) {
  if (text == nullptr || text[0] < '0' || text[0] > '9') return false;
  errno = 0;
  char* end = nullptr;
  const long value = std::strtol(text, &end, 10);
  if (errno != 0 || *end != '\0' || value < 1 || value > kMaxThreads) return false;
  *threads = static_cast<int>(value);
  return true;
}

}  // namespace

int selectThreadCount(int count, const char* const* arguments, const char* environment,
                      int* threads) {
  *threads = 0;
  const char* given = nullptr;
  bool seen = false;
  for (int i = 0; i < count; ++i) {
    if (isThreadsSwitch(arguments[i])) {
      seen = true;
      given = i + 1 < count ? arguments[++i] : nullptr;
    } else if (isThreadsAssignment(arguments[i])) {
      seen = true;
      given = arguments[i] + kThreadsSwitchLength + 1;
    }
  }
  if (seen) return parseThreads(given, threads) ? 1 : 0;
  if (environment == nullptr || environment[0] == '\0') return 1;
  return parseThreads(environment, threads) ? 1 : 0;
}

bool hasHostModeArgument(int count, const char* const* arguments) {
  for (int i = 0; i < count; ++i) {
    if (isHostModeSwitch(arguments[i])) return true;
  }
  return false;
}

bool hasQuietArgument(int count, const char* const* arguments) {
  for (int i = 0; i < count; ++i) {
    if (isQuietSwitch(arguments[i])) return true;
  }
  return false;
}

std::string commandLineText(const char* program, int count, const char* const* arguments) {
  std::string text = program != nullptr ? program : "karnet";
  for (int i = 0; i < count; ++i) {
    const std::string argument = arguments[i];
    text += ' ';
    if (!argument.empty() && argument.find_first_of(" \t\n'\"\\$`") == std::string::npos) {
      text += argument;
      continue;
    }
    // Single quotes keep everything but a single quote, which ends and restarts them.
    text += '\'';
    for (char c : argument) {
      if (c == '\'') {
        text += "'\\''";
      } else {
        text += c;
      }
    }
    text += '\'';
  }
  return text;
}

int selectParameterFile(int count, const char* const* arguments, char* name) {
  std::memset(name, 0, kFileNameSize);
  for (int i = 0; i < count; ++i) {
    if (isThreadsSwitch(arguments[i])) {
      ++i;  // and its value
      continue;
    }
    if (isSkipped(arguments[i])) continue;
    std::strncpy(name, arguments[i], kFileNameSize - 1);
    name[kFileNameSize - 1] = '\0';
  }
  // With no argument at all there is no parameter file to name.
  if (count <= 0) return 0;
  return std::strncmp(name, arguments[count - 1], kFileNameSize) == 0 ? 1 : 0;
}

int makeLogFileName(const char* parameterFile, char* output) {
  output[0] = '\0';
  const char* slash = std::strrchr(parameterFile, '/');
  const char* baseName = slash != nullptr ? slash + 1 : parameterFile;
  // The extension is the last dot of the file's own name and what follows.
  const char* dot = std::strrchr(baseName, '.');
  const std::size_t stemLength =
      dot != nullptr ? static_cast<std::size_t>(dot - parameterFile) : std::strlen(parameterFile);
  static constexpr char kExtension[] = ".log";
  if (stemLength + sizeof kExtension > kFileNameSize) return 0;
  std::memcpy(output, parameterFile, stemLength);
  std::memcpy(output + stemLength, kExtension, sizeof kExtension);
  return 1;
}

}  // namespace karnet
