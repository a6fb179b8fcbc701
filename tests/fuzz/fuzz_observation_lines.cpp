// The observation file's line reader and number parser on arbitrary bytes.
// Checks what the data scan relies on: every line is seen once, in the
// numbering the line count of run initialisation uses, a line holding a NUL
// byte is reported, and only four finite numbers are ever accepted.
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

#include "input/observation_line.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using namespace karnet;
  // Lines as run initialisation counts them: every line feed ends one, and a
  // last line without a line feed counts too.
  std::size_t expectedLines = 0;
  for (std::size_t i = 0; i < size; ++i) expectedLines += data[i] == '\n';
  if (size > 0 && data[size - 1] != '\n') ++expectedLines;

  std::FILE* stream = size > 0 ? fmemopen(const_cast<std::uint8_t*>(data), size, "rb")
                               : std::fopen("/dev/null", "rb");
  if (stream == nullptr) std::abort();
  std::string line;
  std::size_t lines = 0;
  std::size_t offset = 0;  // where the current line starts in data
  for (;;) {
    const LineRead got = readObservationLine(stream, line);
    if (got == LineRead::kEnd) break;
    ++lines;
    const std::uint8_t* feed =
        static_cast<const std::uint8_t*>(std::memchr(data + offset, '\n', size - offset));
    const std::size_t end = feed != nullptr ? static_cast<std::size_t>(feed - data) : size;
    const bool hasNul = std::memchr(data + offset, '\0', end - offset) != nullptr;
    if (hasNul != (got == LineRead::kNulByte)) std::abort();
    if (!hasNul &&
        (line.size() != end - offset || std::memcmp(line.data(), data + offset, line.size()) != 0)) {
      std::abort();
    }
    double v[4];
    if (parseObservation(line.c_str(), v)) {
      for (double x : v) {
        if (!std::isfinite(x)) std::abort();
      }
    }
    offset = end + 1;
  }
  std::fclose(stream);
  if (lines != expectedLines) std::abort();
  return 0;
}
