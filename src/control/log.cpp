// The run's single report stream.
#include "control/log.h"

#include <cstdarg>
#include <cstring>

namespace karnet {

std::FILE* logStream = nullptr;

void logSetStream(std::FILE* stream) { logStream = stream; }

void logWrite(const char* text) {
  if (logStream == nullptr || text == nullptr) return;
  std::fputs(text, logStream);
  if (std::strchr(text, '\n') == nullptr) std::fputc('\n', logStream);
}

void logPrintf(const char* format, ...) {
  if (logStream == nullptr || format == nullptr) return;
  va_list arguments;
  va_start(arguments, format);
  std::vfprintf(logStream, format, arguments);
  va_end(arguments);
}

void logClose() {
  if (logStream == nullptr) return;
  std::FILE* stream = logStream;
  logStream = nullptr;
  // The standard error stream stands in for the log when the log file could
  // not be created; it is flushed but stays open for later messages.
  if (stream == stderr) {
    std::fflush(stream);
  } else {
    std::fclose(stream);
  }
}

}  // namespace karnet
