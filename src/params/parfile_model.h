#ifndef KARNET_PARAMS_PARFILE_MODEL_H_
#define KARNET_PARAMS_PARFILE_MODEL_H_

#include <deque>
#include <string>
#include <string_view>
#include <vector>

#include "params/parfile.h"

// The in-memory form of a loaded parameter file, shared by the parser and the
// lookup functions of parfile.h. Nothing here is part of the public interface.

namespace karnet {

enum class ParKind { kNumber, kText, kFileName, kWord };

struct ParParam {
  ParKind kind = ParKind::kNumber;
  std::string text;  // number as written, text or word content, resolved file name
  const ParKeyword* keyword = nullptr;
};

struct ParKeyword {
  std::string name;
  int line = 0;
  std::vector<ParParam> params;
  const ParBlock* block = nullptr;
};

struct ParBlock {
  std::string name;
  int line = 0;     // the [NAME] line
  int endLine = 0;  // the EndSect line
  const ParBlock* parent = nullptr;  // null for a target
  const ParFile* file = nullptr;
  std::vector<ParBlock*> sections;
  std::deque<ParKeyword> keywords;  // deque: addresses stay put while growing
};

struct ParFile {
  std::string displayName;  // base name and extension, for messages
  std::string directory;    // "" or ending in '/': base of relative file names
  int lineCount = 0;
  std::deque<ParBlock> blocks;  // every block, flat, so nothing is freed recursively
  std::vector<ParBlock*> targets;
};

// Parses text into file (whose displayName and directory are set). On a syntax
// error returns false with the line number and the reason.
bool parParseText(std::string_view text, ParFile& file, int* errorLine, std::string* reason);

// A short printable rendering of untrusted text for messages: at most
// maxChars characters, non-printable bytes as \xNN, "..." when cut.
std::string parPrintable(std::string_view text, std::size_t maxChars = 40);

}  // namespace karnet

#endif  // KARNET_PARAMS_PARFILE_MODEL_H_
