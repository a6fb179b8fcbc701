#ifndef KARNET_INPUT_OBSERVATION_LINE_H_
#define KARNET_INPUT_OBSERVATION_LINE_H_

#include <cstdio>
#include <string>

namespace karnet {

// Parses "x y z value": four finite numbers separated by white space; anything
// after the fourth is ignored. False for fewer or non-finite numbers.
bool parseObservation(const char* line, double out[4]);

// What readObservationLine found.
enum class LineRead {
  kLine,     // a line (its line feed removed) is in text
  kEnd,      // end of file, text empty
  kNulByte,  // a line holding a NUL byte; text holds the line up to the byte
};

// Reads one line of any length without its line feed. A NUL byte would cut
// the line short for the number parser and hide where the line ends, so such
// a line is reported as kNulByte (the whole line is consumed).
LineRead readObservationLine(std::FILE* file, std::string& text);

}  // namespace karnet

#endif  // KARNET_INPUT_OBSERVATION_LINE_H_
