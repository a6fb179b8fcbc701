// The run's single report stream.
#include "control/log.h"

#include <cstdarg>
#include <cstring>
#include <vector>

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

void Report::write(const char* text) {
  if (text == nullptr) return;
  put(text);
  if (std::strchr(text, '\n') == nullptr) put("\n");
}

void Report::printf(const char* format, ...) {
  if (format == nullptr) return;
  va_list arguments;
  va_start(arguments, format);
  va_list again;
  va_copy(again, arguments);
  char small[256];
  const int length = std::vsnprintf(small, sizeof small, format, arguments);
  va_end(arguments);
  if (length < 0) {
    va_end(again);
    return;
  }
  if (static_cast<std::size_t>(length) < sizeof small) {
    va_end(again);
    put(std::string_view(small, static_cast<std::size_t>(length)));
    return;
  }
  std::vector<char> large(static_cast<std::size_t>(length) + 1);
  std::vsnprintf(large.data(), large.size(), format, again);
  va_end(again);
  put(std::string_view(large.data(), static_cast<std::size_t>(length)));
}

void LogReport::put(std::string_view text) {
  if (logStream == nullptr || text.empty()) return;
  std::fwrite(text.data(), 1, text.size(), logStream);
}

Report& runLog() {
  static LogReport log;
  return log;
}

}  // namespace karnet
