// The run's single report stream.
#include "control/log.h"

#include <unistd.h>

#include <cstdarg>
#include <cstdlib>
#include <cstring>
#include <utility>
#include <vector>

namespace karnet {

std::FILE* logStream = nullptr;

namespace {

// The held log file and the memory stream that takes its lines meanwhile.
std::FILE* heldFile = nullptr;
std::FILE* heldLines = nullptr;
char* heldText = nullptr;
std::size_t heldSize = 0;

// Closes the memory stream; its text stays in heldText (heldSize bytes).
void endHolding() {
  if (logStream == heldLines) logStream = nullptr;
  std::fclose(heldLines);
  heldLines = nullptr;
}

// Empties the log file. Should that fail, the log is written over from its
// start, which is all that can be done.
void emptyFile(std::FILE* file) {
  if (ftruncate(fileno(file), 0) != 0) std::rewind(file);
}

void freeHeldText() {
  std::free(heldText);
  heldText = nullptr;
  heldSize = 0;
}

}  // namespace

void logHold(std::FILE* file) {
  if (file == nullptr) return;
  heldLines = open_memstream(&heldText, &heldSize);
  if (heldLines == nullptr) {
    // Without memory to hold them, the lines go to the file at once.
    emptyFile(file);
    logStream = file;
    return;
  }
  heldFile = file;
  logStream = heldLines;
}

void logRelease() {
  if (heldFile == nullptr) return;
  endHolding();
  std::FILE* file = std::exchange(heldFile, nullptr);
  emptyFile(file);
  if (heldSize > 0) std::fwrite(heldText, 1, heldSize, file);
  freeHeldText();
  logStream = file;
}

void logDiscardHeld() {
  if (heldFile == nullptr) return;
  endHolding();
  std::fclose(std::exchange(heldFile, nullptr));
  if (heldSize > 0) std::fwrite(heldText, 1, heldSize, stderr);
  freeHeldText();
  logStream = stderr;
}

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
  logRelease();
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
