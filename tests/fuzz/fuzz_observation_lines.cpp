// The observation file's block reader and number parser on arbitrary bytes.
// Checks what the data scan relies on: lines numbered as the line count of run
// initialisation numbers them, every line before the first unusable one stored
// once with the numbers the parser gives for it alone (later lines at most
// once, and only usable ones), the first line holding
// a NUL byte, not parsing or lying beyond the limit named, whatever the block
// size and thread count; and only four finite numbers are ever accepted.
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <mutex>
#include <string>
#include <vector>

#include "input/observation_line.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using namespace karnet;
  using Stop = ObservationLinesRead::Stop;
  if (size < 2) return 0;
  // The first two bytes choose the block size, thread count and limit; the
  // rest is the file.
  const std::size_t block = 1 + data[0] % 64;
  const int threads = 1 + data[1] % 3;
  const auto* text = data + 2;
  const std::size_t length = size - 2;

  // The lines as run initialisation counts them, and the first unusable one.
  std::vector<std::string> lines;
  for (std::size_t at = 0; at < length;) {
    const auto* feed = static_cast<const std::uint8_t*>(std::memchr(text + at, '\n', length - at));
    const std::size_t end = feed != nullptr ? static_cast<std::size_t>(feed - text) : length;
    lines.emplace_back(reinterpret_cast<const char*>(text + at), end - at);
    at = end + 1;
  }
  const auto limit = static_cast<std::int64_t>(lines.size()) - (data[1] / 3) % 2;
  std::int64_t firstStop = -1;
  Stop expectedStop = Stop::kEnd;
  std::vector<std::vector<double>> numbers(lines.size());  // empty: the line cannot be stored
  for (std::size_t i = 0; i < lines.size(); ++i) {
    double v[4];
    Stop stop = Stop::kEnd;
    if (lines[i].find('\0') != std::string::npos) {
      stop = Stop::kNulByte;
    } else if (!parseObservation(lines[i].c_str(), v)) {
      stop = Stop::kUnreadable;
    } else if (static_cast<std::int64_t>(i) >= limit) {
      stop = Stop::kBeyondLimit;
    } else {
      for (double x : v) {
        if (!std::isfinite(x)) std::abort();
      }
      numbers[i].assign(v, v + 4);
    }
    if (stop != Stop::kEnd && firstStop < 0) {
      firstStop = static_cast<std::int64_t>(i);
      expectedStop = stop;
    }
  }

  std::FILE* stream = length > 0 ? fmemopen(const_cast<std::uint8_t*>(text), length, "rb")
                                 : std::fopen("/dev/null", "rb");
  if (stream == nullptr) std::abort();
  std::mutex guard;
  std::vector<int> seen(lines.size(), 0);
  const ObservationLinesRead read = readObservationLines(
      stream, limit, threads, block,
      [&](std::int64_t i, const double* v) {
        const std::lock_guard<std::mutex> lock(guard);
        if (i < 0 || static_cast<std::size_t>(i) >= lines.size()) std::abort();
        // Lines after the stop may be stored too (by threads working on later
        // lines), but only lines that can be, with their own numbers.
        if (++seen[static_cast<std::size_t>(i)] > 1) std::abort();
        if (numbers[static_cast<std::size_t>(i)] != std::vector<double>(v, v + 4)) std::abort();
      },
      [] {});
  std::fclose(stream);

  if (read.stop != expectedStop) std::abort();
  const std::int64_t stored = firstStop >= 0 ? firstStop : static_cast<std::int64_t>(lines.size());
  if (read.lines != stored) std::abort();
  for (std::int64_t i = 0; i < stored; ++i) {
    if (seen[static_cast<std::size_t>(i)] != 1) std::abort();
  }
  if (expectedStop == Stop::kUnreadable && read.stopLine != lines[static_cast<std::size_t>(firstStop)]) {
    std::abort();
  }
  return 0;
}
