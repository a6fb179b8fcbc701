#include "support/file_check.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

namespace karnet {

std::string inputFileProblem(const char* path) {
  if (path == nullptr || path[0] == '\0') return "no file name";
  struct stat info;
  if (::stat(path, &info) != 0) return std::strerror(errno);
  if (!S_ISREG(info.st_mode)) {
    return S_ISDIR(info.st_mode) ? "is a directory, not a regular file" : "not a regular file";
  }
  if (::access(path, R_OK) != 0) return std::strerror(errno);
  return std::string();
}

std::string notice(const std::string& text) { return "karnet: " + text + "\n"; }

std::string fileNotice(const std::string& file, const std::string& reason) {
  return notice(file + ": " + reason);
}

}  // namespace karnet
