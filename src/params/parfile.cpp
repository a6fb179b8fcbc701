// Lookups and conversions over a loaded parameter file (see parfile.h).
#include "params/parfile.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <new>
#include <string>
#include <string_view>
#include <vector>

#include "params/parfile_model.h"

namespace karnet {

namespace {

// The pending error of the calling thread: code and text.
struct PendingError {
  int code = kParOk;
  std::string text;
};

PendingError& pending() {
  thread_local PendingError error;
  return error;
}

int fail(int code, std::string text) {
  PendingError& error = pending();
  error.code = code;
  error.text = std::move(text);
  return 0;
}

// "NAME:LINE: reason", the form of every message about the file's contents.
int failAt(const ParFile* file, int line, int code, const std::string& reason) {
  std::string where = file != nullptr ? file->displayName : std::string("?");
  return fail(code, where + ":" + std::to_string(line < 1 ? 1 : line) + ": " + reason);
}

// "section [NAME]", "keyword NAME", with the occurrence when it is not the first.
std::string occurrenceText(const char* kind, const char* name, int occurrence, bool block) {
  std::string shown = parPrintable(name, 80);
  std::string text = std::string(kind) + " " + (block ? "[" + shown + "]" : shown);
  if (occurrence > 1) text = "occurrence " + std::to_string(occurrence) + " of " + text;
  return text;
}

std::string displayNameOf(const char* path) {
  std::string_view whole(path);
  std::size_t slash = whole.find_last_of('/');
  std::string_view base = slash == std::string_view::npos ? whole : whole.substr(slash + 1);
  if (base.empty()) base = whole;
  // Keeps UTF-8 names readable; only control characters are escaped, so that
  // a message stays on one line.
  std::string shown;
  for (char c : base) {
    const unsigned char u = static_cast<unsigned char>(c);
    if (u < 0x20 || u == 0x7f) {
      shown += parPrintable(std::string_view(&c, 1));
    } else {
      shown += c;
    }
  }
  return shown;
}

std::string directoryOf(const char* path) {
  std::string_view whole(path);
  std::size_t slash = whole.find_last_of('/');
  if (slash == std::string_view::npos) return std::string();
  return std::string(whole.substr(0, slash + 1));
}

// Reads the whole file; false when it cannot be read, is too large or is not a
// regular file. Opening does not wait: a FIFO or a device is refused at once
// instead of blocking the run or streaming without end.
bool readWholeFile(const char* path, std::string* text, bool* tooLarge, bool* notRegular) {
  *tooLarge = false;
  *notRegular = false;
  const int fd = open(path, O_RDONLY | O_NONBLOCK | O_CLOEXEC | O_NOCTTY);
  if (fd < 0) return false;
  struct stat info {};
  if (fstat(fd, &info) != 0 || !S_ISREG(info.st_mode)) {
    *notRegular = !S_ISDIR(info.st_mode);
    close(fd);
    return false;
  }
  std::FILE* stream = fdopen(fd, "rb");
  if (stream == nullptr) {
    close(fd);
    return false;
  }
  if (static_cast<std::uintmax_t>(info.st_size) > kParMaxFileSize) {
    std::fclose(stream);
    *tooLarge = true;
    return false;
  }
  char buffer[65536];
  bool ok = true;
  for (;;) {
    std::size_t n = std::fread(buffer, 1, sizeof buffer, stream);
    if (n > 0) {
      if (text->size() + n > kParMaxFileSize) {
        *tooLarge = true;
        ok = false;
        break;
      }
      text->append(buffer, n);
    }
    if (n < sizeof buffer) {
      ok = std::ferror(stream) == 0;
      break;
    }
  }
  std::fclose(stream);
  return ok;
}

const ParFile* fileOf(const ParKeyword* keyword) {
  return keyword != nullptr && keyword->block != nullptr ? keyword->block->file : nullptr;
}

int paramNumber(const ParParam* param) {
  const ParKeyword* keyword = param->keyword;
  if (keyword == nullptr || keyword->params.empty()) return 0;
  return static_cast<int>(param - keyword->params.data()) + 1;
}

std::string paramWhat(const ParParam* param) {
  std::string keyword = param->keyword != nullptr ? param->keyword->name : std::string("?");
  std::string text = "keyword " + keyword + ": parameter " + std::to_string(paramNumber(param));
  switch (param->kind) {
    case ParKind::kNumber:
      return text + " (the number " + param->text + ")";
    case ParKind::kText:
      return text + " (the text '" + parPrintable(param->text) + "')";
    case ParKind::kFileName:
      return text + " (the file name |" + parPrintable(param->text) + "|)";
    case ParKind::kWord:
      return text + " (the word " + parPrintable(param->text) + ")";
  }
  return text;
}

int failConvert(const ParParam* param, const char* expected) {
  return failAt(fileOf(param->keyword), param->keyword != nullptr ? param->keyword->line : 0,
                kParErrorConvert, paramWhat(param) + " is not " + expected);
}

// Conversions of one parameter; on failure the error is set and false returned.
bool convertInt(const ParParam* param, std::int32_t* value) {
  if (param->kind != ParKind::kNumber ||
      param->text.find_first_of(".eE") != std::string::npos) {
    failConvert(param, "an integer");
    return false;
  }
  errno = 0;
  char* end = nullptr;
  long long parsed = std::strtoll(param->text.c_str(), &end, 10);
  if (errno == ERANGE || end == nullptr || *end != '\0' ||
      parsed < std::numeric_limits<std::int32_t>::min() ||
      parsed > std::numeric_limits<std::int32_t>::max()) {
    failConvert(param, "an integer within 32 bits");
    return false;
  }
  *value = static_cast<std::int32_t>(parsed);
  return true;
}

bool convertFloat(const ParParam* param, float* value) {
  if (param->kind != ParKind::kNumber) {
    failConvert(param, "a number");
    return false;
  }
  char* end = nullptr;
  double parsed = std::strtod(param->text.c_str(), &end);
  float narrowed = static_cast<float>(parsed);
  // Underflow gives a tiny value or zero, which is what was meant; overflow
  // of the double or of the float is refused.
  if (end == nullptr || *end != '\0' || !std::isfinite(parsed) || !std::isfinite(narrowed)) {
    failConvert(param, "a number within the float range");
    return false;
  }
  *value = narrowed;
  return true;
}

bool convertText(const ParParam* param, const char** value) {
  if (param->kind != ParKind::kText && param->kind != ParKind::kWord) {
    failConvert(param, "a text");
    return false;
  }
  *value = param->text.c_str();
  return true;
}

bool convertFileName(const ParParam* param, const char** value) {
  if (param->kind != ParKind::kFileName) {
    failConvert(param, "a file name between | |");
    return false;
  }
  *value = param->text.c_str();
  return true;
}

// The parameter, or null with the error set.
const ParParam* findParam(const ParBlock* section, const char* keyword, int occurrence,
                          int number) {
  const ParKeyword* found = parKeywordByNameNum(section, keyword, occurrence);
  if (found == nullptr) return nullptr;
  return parParamByNum(found, number);
}

}  // namespace

ParFile* parLoadFile(const char* path, int /*flags*/) {
  parClearErrorGlb();
  if (path == nullptr) {
    fail(kParErrorArgument, "Can't open (no file name)");
    return nullptr;
  }
  std::string text;
  bool tooLarge = false;
  bool notRegular = false;
  if (!readWholeFile(path, &text, &tooLarge, &notRegular)) {
    if (notRegular) {
      fail(kParErrorOpen, "Can't open " + displayNameOf(path) + " (not a regular file)");
    } else if (tooLarge) {
      fail(kParErrorTooLarge, "Can't open " + displayNameOf(path) + " (larger than " +
                                  std::to_string(kParMaxFileSize) + " bytes)");
    } else {
      fail(kParErrorOpen, "Can't open " + displayNameOf(path));
    }
    return nullptr;
  }
  ParFile* file = new (std::nothrow) ParFile;
  if (file == nullptr) {
    fail(kParErrorOpen, "Can't open " + displayNameOf(path) + " (out of memory)");
    return nullptr;
  }
  file->displayName = displayNameOf(path);
  file->directory = directoryOf(path);
  int line = 0;
  std::string reason;
  bool parsed = false;
  try {
    parsed = parParseText(text, *file, &line, &reason);
  } catch (const std::bad_alloc&) {
    reason = "out of memory";
  }
  if (!parsed) {
    failAt(file, line, kParErrorSyntax, reason);
    delete file;
    return nullptr;
  }
  return file;
}

void parClose(ParFile** file) {
  if (file == nullptr) return;
  delete *file;
  *file = nullptr;
}

ParBlock* parTargetByNameNum(const ParFile* file, const char* name, int occurrence) {
  parClearErrorGlb();
  if (file == nullptr || name == nullptr || occurrence < 1) {
    fail(kParErrorArgument, "invalid target lookup");
    return nullptr;
  }
  int seen = 0;
  for (ParBlock* target : file->targets) {
    if (target->name == name && ++seen == occurrence) return target;
  }
  failAt(file, file->lineCount, kParErrorMissing,
         occurrenceText("target", name, occurrence, true) + " not found");
  return nullptr;
}

ParBlock* parSectionByNameNum(const ParBlock* block, const char* name, int occurrence) {
  parClearErrorGlb();
  if (block == nullptr || name == nullptr || occurrence < 1) {
    fail(kParErrorArgument, "invalid section lookup");
    return nullptr;
  }
  int seen = 0;
  for (ParBlock* section : block->sections) {
    if (section->name == name && ++seen == occurrence) return section;
  }
  failAt(block->file, block->endLine, kParErrorMissing,
         occurrenceText("section", name, occurrence, true) + " not found in [" + block->name + "]");
  return nullptr;
}

ParKeyword* parKeywordByNameNum(const ParBlock* block, const char* name, int occurrence) {
  parClearErrorGlb();
  if (block == nullptr || name == nullptr || occurrence < 1) {
    fail(kParErrorArgument, "invalid keyword lookup");
    return nullptr;
  }
  int seen = 0;
  for (const ParKeyword& keyword : block->keywords) {
    if (keyword.name == name && ++seen == occurrence) return const_cast<ParKeyword*>(&keyword);
  }
  failAt(block->file, block->endLine, kParErrorMissing,
         occurrenceText("keyword", name, occurrence, false) + " not found in section [" +
             block->name + "]");
  return nullptr;
}

ParParam* parParamByNum(const ParKeyword* keyword, int number) {
  parClearErrorGlb();
  if (keyword == nullptr || number < 1) {
    fail(kParErrorArgument, "invalid parameter lookup");
    return nullptr;
  }
  if (static_cast<std::size_t>(number) > keyword->params.size()) {
    failAt(fileOf(keyword), keyword->line, kParErrorMissing,
           "keyword " + keyword->name + " has no parameter " + std::to_string(number) +
               " (it has " + std::to_string(keyword->params.size()) + ")");
    return nullptr;
  }
  return const_cast<ParParam*>(&keyword->params[static_cast<std::size_t>(number) - 1]);
}

const char* parGetString(const ParParam* param) {
  parClearErrorGlb();
  if (param == nullptr) {
    fail(kParErrorArgument, "invalid parameter");
    return "";
  }
  const char* value = "";
  if (!convertText(param, &value)) return "";
  return value;
}

int parGetParam(const ParBlock* section, const char* keyword, float* value, int occurrence,
                int number) {
  const ParParam* param = findParam(section, keyword, occurrence, number);
  if (param == nullptr) return 0;
  if (value == nullptr) return fail(kParErrorArgument, "invalid output");
  return convertFloat(param, value) ? 1 : 0;
}

int parGetParam(const ParBlock* section, const char* keyword, std::int32_t* value,
                int occurrence, int number) {
  const ParParam* param = findParam(section, keyword, occurrence, number);
  if (param == nullptr) return 0;
  if (value == nullptr) return fail(kParErrorArgument, "invalid output");
  return convertInt(param, value) ? 1 : 0;
}

int parGetParamFilename(const ParBlock* section, const char* keyword, const char** value,
                        int occurrence, int number) {
  const ParParam* param = findParam(section, keyword, occurrence, number);
  if (param == nullptr) return 0;
  if (value == nullptr) return fail(kParErrorArgument, "invalid output");
  return convertFileName(param, value) ? 1 : 0;
}

int parGetListParamOuts(const ParBlock* section, const char* keyword, int occurrence,
                        const char* format, const ParListOut* outs, std::size_t count) {
  const ParKeyword* found = parKeywordByNameNum(section, keyword, occurrence);
  if (found == nullptr) return 0;
  if (format == nullptr || outs == nullptr || std::strlen(format) != count) {
    return fail(kParErrorArgument, "invalid list format");
  }
  for (std::size_t i = 0; i < count; ++i) {
    if (outs[i].kind != format[i] || outs[i].target == nullptr) {
      return fail(kParErrorArgument, "list format and outputs disagree");
    }
  }
  if (found->params.size() != count) {
    return failAt(fileOf(found), found->line, kParErrorConvert,
                  "keyword " + found->name + " has " + std::to_string(found->params.size()) +
                      (found->params.size() == 1 ? " value, " : " values, ") +
                      std::to_string(count) + " expected");
  }
  // Convert everything first so that a failure stores nothing.
  std::vector<std::int32_t> ints(count);
  std::vector<float> floats(count);
  std::vector<const char*> texts(count);
  for (std::size_t i = 0; i < count; ++i) {
    const ParParam* param = &found->params[i];
    bool ok = false;
    switch (format[i]) {
      case 'i':
        ok = convertInt(param, &ints[i]);
        break;
      case 'f':
        ok = convertFloat(param, &floats[i]);
        break;
      case 's':
        ok = convertText(param, &texts[i]);
        break;
      default:
        return fail(kParErrorArgument, "invalid list format");
    }
    if (!ok) return 0;
  }
  for (std::size_t i = 0; i < count; ++i) {
    switch (format[i]) {
      case 'i':
        *static_cast<std::int32_t*>(outs[i].target) = ints[i];
        break;
      case 'f':
        *static_cast<float*>(outs[i].target) = floats[i];
        break;
      default:
        *static_cast<const char**>(outs[i].target) = texts[i];
        break;
    }
  }
  return 1;
}

int parPeekErrorGlb() { return pending().code; }

const char* parErrorTextGlb() { return pending().text.c_str(); }

void parClearErrorGlb() {
  PendingError& error = pending();
  error.code = kParOk;
  error.text.clear();
}

const char* parFileName(const ParFile* file) {
  return file != nullptr ? file->displayName.c_str() : "";
}

int parKeywordLine(const ParKeyword* keyword) { return keyword != nullptr ? keyword->line : 0; }

}  // namespace karnet
