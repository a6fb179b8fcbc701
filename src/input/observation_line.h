#ifndef KARNET_INPUT_OBSERVATION_LINE_H_
#define KARNET_INPUT_OBSERVATION_LINE_H_

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <functional>
#include <string>

namespace karnet {

// Parses "x y z value": four finite numbers separated by white space; anything
// after the fourth is ignored. False for fewer or non-finite numbers.
bool parseObservation(const char* line, double out[4]);

// What readObservationLines did: how many lines it stored and, should it have
// stopped early, at which line (0-based, in file order) and why.
struct ObservationLinesRead {
  enum class Stop {
    kEnd,         // every line stored
    kNulByte,     // the line holds a NUL byte
    kUnreadable,  // the line is not four finite numbers
    kBeyondLimit  // a readable line beyond the limit: the file has more lines than expected
  };
  Stop stop = Stop::kEnd;
  std::int64_t lines = 0;  // lines stored before the stop
  std::string stopLine;    // the line stopped at, up to any NUL byte
};

// Reads the lines of file (each ended by a line feed, and a last one without
// it) in blocks of about blockBytes (more for a longer line), and parses each
// block's lines on up to `threads` threads: store(index, v) receives line
// index's four numbers (index from 0 in file order; called from any of the
// threads, once per line). Every line before the first one, in file order,
// that cannot be stored (a NUL byte, not four numbers, an index of limit or
// more) is stored; so may be some after it, which the caller, stopping there,
// leaves unused. betweenBlocks runs on the calling thread after each block.
ObservationLinesRead readObservationLines(
    std::FILE* file, std::int64_t limit, int threads, std::size_t blockBytes,
    const std::function<void(std::int64_t, const double*)>& store,
    const std::function<void()>& betweenBlocks);

}  // namespace karnet

#endif  // KARNET_INPUT_OBSERVATION_LINE_H_
