#include "input/observation_line.h"

#include <cerrno>
#include <cmath>
#include <cstdlib>
#include <cstring>

namespace karnet {

bool parseObservation(const char* line, double out[4]) {
  const char* p = line;
  for (int n = 0; n < 4; ++n) {
    char* end = nullptr;
    errno = 0;
    const double v = std::strtod(p, &end);
    if (end == p || !std::isfinite(v)) return false;
    out[n] = v;
    p = end;
  }
  return true;
}

LineRead readObservationLine(std::FILE* file, std::string& text) {
  text.clear();
  bool any = false;
  bool nul = false;
  char buffer[4096];
  for (;;) {
    // fgets cannot tell how many bytes it stored when one of them is NUL, so
    // the line is read byte-wise within the buffer with getc_unlocked.
    std::size_t n = 0;
    int c = EOF;
    while (n < sizeof buffer && (c = getc_unlocked(file)) != EOF && c != '\n') {
      buffer[n++] = static_cast<char>(c);
    }
    if (n > 0) {
      any = true;
      if (!nul && std::memchr(buffer, '\0', n) != nullptr) nul = true;
      text.append(buffer, n);
    }
    if (c == '\n') {
      any = true;
      break;
    }
    if (c == EOF) break;
  }
  if (nul) {
    text.resize(std::strlen(text.c_str()));
    return LineRead::kNulByte;
  }
  return any ? LineRead::kLine : LineRead::kEnd;
}

}  // namespace karnet
