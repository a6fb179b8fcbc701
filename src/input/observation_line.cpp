#include "input/observation_line.h"

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <utility>
#include <vector>

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

namespace {

// The lines of one piece of a block of text, and the first that could not be
// stored.
struct Piece {
  char* begin = nullptr;
  char* end = nullptr;
  std::int64_t firstIndex = 0;
  ObservationLinesRead::Stop stop = ObservationLinesRead::Stop::kEnd;
  std::int64_t stopIndex = -1;
  const char* stopLine = nullptr;
};

// Parses a piece's lines, each ended by a line feed or by the piece's end
// (which, for the last line of a file without a final line feed, must be
// followed by a byte that may be overwritten). Line feeds become NUL bytes.
void parsePiece(Piece& piece, std::int64_t limit,
                const std::function<void(std::int64_t, const double*)>& store) {
  std::int64_t index = piece.firstIndex;
  for (char* line = piece.begin; line < piece.end; ++index) {
    auto* feed = static_cast<char*>(
        std::memchr(line, '\n', static_cast<std::size_t>(piece.end - line)));
    char* lineEnd = feed != nullptr ? feed : piece.end;
    *lineEnd = '\0';
    double v[4];
    ObservationLinesRead::Stop stop = ObservationLinesRead::Stop::kEnd;
    if (std::memchr(line, '\0', static_cast<std::size_t>(lineEnd - line)) != nullptr) {
      stop = ObservationLinesRead::Stop::kNulByte;
    } else if (!parseObservation(line, v)) {
      stop = ObservationLinesRead::Stop::kUnreadable;
    } else if (index >= limit) {
      stop = ObservationLinesRead::Stop::kBeyondLimit;
    }
    if (stop != ObservationLinesRead::Stop::kEnd) {
      piece.stop = stop;
      piece.stopIndex = index;
      piece.stopLine = line;
      return;
    }
    store(index, v);
    line = lineEnd + 1;
  }
}

// Splits text[0, size) into at most `count` pieces of whole lines and gives
// each the index of its first line; returns the number of lines.
std::int64_t splitPieces(char* text, std::size_t size, int count, std::int64_t firstIndex,
                         std::vector<Piece>& pieces) {
  pieces.clear();
  char* const end = text + size;
  char* at = text;
  std::int64_t index = firstIndex;
  for (int p = 0; p < count && at < end; ++p) {
    char* cut = p + 1 == count ? end : text + size * static_cast<std::size_t>(p + 1) / count;
    if (cut < at) cut = at;
    if (cut < end) {
      auto* feed = static_cast<char*>(std::memchr(cut, '\n', static_cast<std::size_t>(end - cut)));
      cut = feed != nullptr ? feed + 1 : end;
    }
    Piece piece;
    piece.begin = at;
    piece.end = cut;
    piece.firstIndex = index;
    index += std::count(at, cut, '\n');
    if (cut == end && cut[-1] != '\n') ++index;  // a last line without its line feed
    pieces.push_back(piece);
    at = cut;
  }
  return index - firstIndex;
}

// Bytes of the block being read, left uninitialised.
class Buffer {
 public:
  explicit Buffer(std::size_t size) : data_(new char[size]), size_(size) {}
  char* data() { return data_.get(); }
  std::size_t size() const { return size_; }
  // Makes room for size bytes, keeping the first `kept`.
  void grow(std::size_t size, std::size_t kept) {
    std::unique_ptr<char[]> larger(new char[size]);
    std::memcpy(larger.get(), data_.get(), kept);
    data_ = std::move(larger);
    size_ = size;
  }

 private:
  std::unique_ptr<char[]> data_;
  std::size_t size_;
};

}  // namespace

ObservationLinesRead readObservationLines(
    std::FILE* file, std::int64_t limit, int threads, std::size_t blockBytes,
    const std::function<void(std::int64_t, const double*)>& store,
    const std::function<void()>& betweenBlocks) {
  ObservationLinesRead result;
  const std::size_t block = std::max<std::size_t>(blockBytes, 1);
  // One byte beyond the text: the NUL that ends a last line without a line feed.
  // Not filled beforehand: a small file touches only the pages it needs.
  Buffer buffer(block + 1);
  std::size_t held = 0;  // bytes of an unfinished line carried to the next block
  std::int64_t firstIndex = 0;
  std::vector<Piece> pieces;
  const int pieceCount = std::max(threads, 1);
  for (bool atEnd = false; !atEnd;) {
    if (held == buffer.size() - 1) buffer.grow(2 * held + 1, held);  // a line longer than the block
    const std::size_t room = buffer.size() - 1 - held;
    const std::size_t got = std::fread(buffer.data() + held, 1, room, file);
    atEnd = got < room;
    const std::size_t size = held + got;
    std::size_t complete = size;
    if (!atEnd) {
      const auto* last = static_cast<const char*>(memrchr(buffer.data(), '\n', size));
      if (last == nullptr) {
        held = size;
        continue;
      }
      complete = static_cast<std::size_t>(last - buffer.data()) + 1;
    }
    const std::int64_t lines =
        splitPieces(buffer.data(), complete, pieceCount, firstIndex, pieces);
    // A thread per piece (a short text has fewer pieces than threads).
    const auto team = static_cast<int>(pieces.size());
#pragma omp parallel for schedule(static, 1) num_threads(team) if (team > 1)
    for (std::size_t p = 0; p < pieces.size(); ++p) parsePiece(pieces[p], limit, store);
    for (const Piece& piece : pieces) {
      if (piece.stop != ObservationLinesRead::Stop::kEnd) {
        result.stop = piece.stop;
        result.lines = piece.stopIndex;
        result.stopLine = piece.stopLine;
        return result;
      }
    }
    firstIndex += lines;
    std::memmove(buffer.data(), buffer.data() + complete, size - complete);
    held = size - complete;
    if (betweenBlocks) betweenBlocks();
  }
  result.lines = firstIndex;
  return result;
}

}  // namespace karnet
