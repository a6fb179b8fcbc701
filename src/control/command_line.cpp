// The run mode, the parameter file and the log file name from the arguments.
#include "control/command_line.h"

#include <strings.h>

#include <cstring>

namespace karnet {
namespace {

bool isHostModeSwitch(const char* argument) { return strcasecmp(argument, "//apv") == 0; }

bool isSkipped(const char* argument) {
  return argument[0] == '\0' || isHostModeSwitch(argument) || strcasecmp(argument, "-debug") == 0;
}

}  // namespace

bool hasHostModeArgument(int count, const char* const* arguments) {
  for (int i = 0; i < count; ++i) {
    if (isHostModeSwitch(arguments[i])) return true;
  }
  return false;
}

int selectParameterFile(int count, const char* const* arguments, char* name) {
  std::memset(name, 0, kFileNameSize);
  for (int i = 0; i < count; ++i) {
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
