#include <cstdio>
#include <string>
#include <string_view>
#include <vector>

#include "params/parfile_model.h"

namespace karnet {

namespace {

bool isBlank(char c) { return c == ' ' || c == '\t' || c == '\r' || c == '\f' || c == '\v'; }

bool isNameChar(char c) {
  return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '_';
}

bool isDigit(char c) { return c >= '0' && c <= '9'; }

// Thrown inside the parser only; turned into the false result of parParseText.
struct SyntaxError {
  std::string reason;
};

// A cursor over one line (without its line end).
class LineCursor {
 public:
  explicit LineCursor(std::string_view line) : line_(line) {}

  void skipBlanks() {
    while (pos_ < line_.size() && isBlank(line_[pos_])) ++pos_;
  }
  bool atEnd() const { return pos_ >= line_.size(); }
  // End of the line or the start of a comment.
  bool atEndOrComment() const {
    return atEnd() || line_.substr(pos_, 2) == "//";
  }
  char peek() const { return atEnd() ? '\0' : line_[pos_]; }
  void advance() { ++pos_; }
  std::string_view rest() const { return line_.substr(pos_); }

  std::string_view readName() {
    std::size_t start = pos_;
    while (pos_ < line_.size() && isNameChar(line_[pos_])) ++pos_;
    return line_.substr(start, pos_ - start);
  }

  // Text up to the closing delimiter; the cursor ends after it.
  bool readDelimited(char delimiter, std::string_view* content) {
    std::size_t close = line_.find(delimiter, pos_ + 1);
    if (close == std::string_view::npos) return false;
    *content = line_.substr(pos_ + 1, close - pos_ - 1);
    pos_ = close + 1;
    return true;
  }

  // [+-]? (digits [. digits*] | . digits) ([eE] [+-]? digits)?, then a delimiter.
  bool readNumber(std::string_view* number) {
    std::size_t start = pos_;
    std::size_t p = pos_;
    auto digitsFrom = [&](std::size_t q) {
      while (q < line_.size() && isDigit(line_[q])) ++q;
      return q;
    };
    if (p < line_.size() && (line_[p] == '+' || line_[p] == '-')) ++p;
    std::size_t intEnd = digitsFrom(p);
    bool digits = intEnd > p;
    p = intEnd;
    if (p < line_.size() && line_[p] == '.') {
      std::size_t fracEnd = digitsFrom(p + 1);
      digits = digits || fracEnd > p + 1;
      p = fracEnd;
    }
    bool ok = digits;
    if (ok && p < line_.size() && (line_[p] == 'e' || line_[p] == 'E')) {
      std::size_t q = p + 1;
      if (q < line_.size() && (line_[q] == '+' || line_[q] == '-')) ++q;
      std::size_t expEnd = digitsFrom(q);
      ok = expEnd > q;
      p = expEnd;
    }
    // The token must end at a blank, a comma, a comment or the line end.
    if (ok && p < line_.size() && !isBlank(line_[p]) && line_[p] != ',' && line_[p] != '/') {
      ok = false;
    }
    if (!ok) {
      while (p < line_.size() && !isBlank(line_[p]) && line_[p] != ',') ++p;
      pos_ = p;
      *number = line_.substr(start, p - start);
      return false;
    }
    pos_ = p;
    *number = line_.substr(start, p - start);
    return true;
  }

 private:
  std::string_view line_;
  std::size_t pos_ = 0;
};

std::string quoted(std::string_view text) { return "'" + parPrintable(text) + "'"; }

std::string resolveFileName(const ParFile& file, std::string_view name) {
  if (name.empty() || name.front() == '/') return std::string(name);
  while (name.size() > 2 && name.substr(0, 2) == "./") {
    name.remove_prefix(2);
    while (!name.empty() && name.front() == '/') name.remove_prefix(1);
  }
  return file.directory + std::string(name);
}

class Parser {
 public:
  explicit Parser(ParFile& file) : file_(file) {}

  void parseLine(std::string_view line, int number) {
    line_ = number;
    if (line.find('\0') != std::string_view::npos) throw SyntaxError{"NUL byte in the line"};
    LineCursor cursor(line);
    cursor.skipBlanks();
    if (cursor.atEndOrComment()) return;
    if (cursor.peek() == '[') {
      openBlock(cursor);
      return;
    }
    if (!isNameChar(cursor.peek())) {
      throw SyntaxError{"expected '[NAME]', 'EndSect' or 'NAME = value', found " +
                        quoted(cursor.rest())};
    }
    std::string_view name = cursor.readName();
    cursor.skipBlanks();
    if (name == "EndSect") {
      if (!cursor.atEndOrComment()) {
        throw SyntaxError{"unexpected text after EndSect: " + quoted(cursor.rest())};
      }
      closeBlock();
      return;
    }
    if (cursor.peek() != '=') {
      throw SyntaxError{"expected '=' after keyword " + quoted(name) + ", found " +
                        (cursor.atEnd() ? std::string("the line end") : quoted(cursor.rest()))};
    }
    cursor.advance();
    readKeyword(name, cursor);
  }

  void finish(int lastLine) {
    if (!open_.empty()) {
      line_ = open_.back()->line;
      throw SyntaxError{"block " + open_.back()->name + " is not closed (EndSect missing)"};
    }
    line_ = lastLine;
  }

  int line() const { return line_; }

 private:
  void openBlock(LineCursor& cursor) {
    cursor.advance();
    cursor.skipBlanks();
    std::string_view name = cursor.readName();
    if (name.empty()) throw SyntaxError{"missing or invalid block name in " + quoted(cursor.rest())};
    cursor.skipBlanks();
    if (cursor.peek() != ']') {
      throw SyntaxError{"expected ']' after block name " + quoted(name) + ", found " +
                        (cursor.atEnd() ? std::string("the line end") : quoted(cursor.rest()))};
    }
    cursor.advance();
    cursor.skipBlanks();
    if (!cursor.atEndOrComment()) {
      throw SyntaxError{"unexpected text after [" + std::string(name) + "]: " +
                        quoted(cursor.rest())};
    }
    ParBlock& block = file_.blocks.emplace_back();
    block.name = std::string(name);
    block.line = line_;
    block.file = &file_;
    if (open_.empty()) {
      file_.targets.push_back(&block);
    } else {
      block.parent = open_.back();
      open_.back()->sections.push_back(&block);
    }
    open_.push_back(&block);
  }

  void closeBlock() {
    if (open_.empty()) throw SyntaxError{"EndSect without an open block"};
    open_.back()->endLine = line_;
    open_.pop_back();
  }

  void readKeyword(std::string_view name, LineCursor& cursor) {
    if (open_.empty()) {
      throw SyntaxError{"keyword " + std::string(name) + " outside of any block"};
    }
    ParBlock& block = *open_.back();
    ParKeyword& keyword = block.keywords.emplace_back();
    keyword.name = std::string(name);
    keyword.line = line_;
    keyword.block = &block;
    for (;;) {
      cursor.skipBlanks();
      if (cursor.atEndOrComment()) {
        throw SyntaxError{keyword.params.empty()
                              ? "keyword " + keyword.name + " has no value"
                              : "missing value after ',' in keyword " + keyword.name};
      }
      keyword.params.push_back(readValue(keyword, cursor));
      cursor.skipBlanks();
      if (cursor.atEndOrComment()) return;
      if (cursor.peek() != ',') {
        throw SyntaxError{"expected ',' between the values of keyword " + keyword.name +
                          ", found " + quoted(cursor.rest())};
      }
      cursor.advance();
    }
  }

  ParParam readValue(const ParKeyword& keyword, LineCursor& cursor) {
    ParParam param;
    param.keyword = &keyword;
    char c = cursor.peek();
    std::string_view content;
    if (c == '\'') {
      if (!cursor.readDelimited('\'', &content)) {
        throw SyntaxError{"unterminated text (closing ' missing) in keyword " + keyword.name};
      }
      param.kind = ParKind::kText;
      param.text = std::string(content);
    } else if (c == '|') {
      if (!cursor.readDelimited('|', &content)) {
        throw SyntaxError{"unterminated file name (closing | missing) in keyword " +
                          keyword.name};
      }
      param.kind = ParKind::kFileName;
      param.text = resolveFileName(file_, content);
    } else if (isDigit(c) || c == '+' || c == '-' || c == '.') {
      if (!cursor.readNumber(&content)) {
        throw SyntaxError{"invalid number " + quoted(content) + " in keyword " + keyword.name};
      }
      param.kind = ParKind::kNumber;
      param.text = std::string(content);
    } else if (isNameChar(c)) {
      param.kind = ParKind::kWord;
      param.text = std::string(cursor.readName());
    } else {
      throw SyntaxError{"invalid value " + quoted(cursor.rest()) + " in keyword " +
                        keyword.name};
    }
    return param;
  }

  ParFile& file_;
  std::vector<ParBlock*> open_;
  int line_ = 0;
};

}  // namespace

std::string parPrintable(std::string_view text, std::size_t maxChars) {
  std::string out;
  std::size_t shown = 0;
  for (char c : text) {
    if (shown == maxChars) {
      out += "...";
      break;
    }
    unsigned char u = static_cast<unsigned char>(c);
    if (u >= 0x20 && u < 0x7f) {
      out += c;
    } else {
      char hex[8];
      std::snprintf(hex, sizeof hex, "\\x%02X", u);
      out += hex;
    }
    ++shown;
  }
  return out;
}

bool parParseText(std::string_view text, ParFile& file, int* errorLine, std::string* reason) {
  if (text.substr(0, 3) == "\xEF\xBB\xBF") text.remove_prefix(3);
  Parser parser(file);
  int number = 0;
  try {
    std::size_t start = 0;
    while (start < text.size()) {
      std::size_t end = text.find('\n', start);
      std::size_t next = end == std::string_view::npos ? text.size() : end + 1;
      if (end == std::string_view::npos) end = text.size();
      std::string_view line = text.substr(start, end - start);
      if (!line.empty() && line.back() == '\r') line.remove_suffix(1);
      parser.parseLine(line, ++number);
      start = next;
    }
    file.lineCount = number;
    parser.finish(number);
  } catch (const SyntaxError& error) {
    *errorLine = parser.line();
    *reason = error.reason;
    return false;
  }
  return true;
}

}  // namespace karnet
