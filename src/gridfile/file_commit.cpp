// Putting a finished file under its final name in one step. The bytes go to
// an unnamed file in the destination directory where the file system allows
// it (nothing of a run ended at any moment stays behind), else to a hidden
// temporary name; either is then renamed over the final name, so that the
// name holds the earlier file or the complete new one, never a part.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

#include "gridfile/grid_file.h"
#include "gridfile/grid_file_internal.h"

namespace karnet {
namespace {

// Temporary names that exist on disk right now, for removal at exit or from
// a signal handler (which may only look at these plain fields).
struct TemporarySlot {
  volatile std::sig_atomic_t used;
  char path[PATH_MAX];
};
constexpr int kSlotCount = 8;
TemporarySlot slots[kSlotCount];
bool cleanupRegistered = false;
unsigned long nameCounter = 0;

void removeAtExit() { grdRemoveTemporaryFiles(); }

int registerTemporary(const std::string& path) {
  if (!cleanupRegistered) {
    cleanupRegistered = std::atexit(removeAtExit) == 0;
  }
  if (path.size() >= PATH_MAX) return -1;
  for (int i = 0; i < kSlotCount; ++i) {
    if (slots[i].used == 0) {
      std::memcpy(slots[i].path, path.c_str(), path.size() + 1);
      slots[i].used = 1;
      return i;
    }
  }
  return -1;
}

void unregisterTemporary(int slot) {
  if (slot >= 0) slots[slot].used = 0;
}

std::string directoryOf(const std::string& path) {
  const std::size_t slash = path.rfind('/');
  if (slash == std::string::npos) return ".";
  if (slash == 0) return "/";
  return path.substr(0, slash);
}

std::string baseOf(const std::string& path) {
  const std::size_t slash = path.rfind('/');
  return slash == std::string::npos ? path : path.substr(slash + 1);
}

std::string temporaryName(const std::string& finalName) {
  char suffix[64];
  std::snprintf(suffix, sizeof suffix, ".%ld.%lu.tmp", static_cast<long>(getpid()),
                ++nameCounter);
  return directoryOf(finalName) + "/." + baseOf(finalName) + suffix;
}

bool writeAll(int fd, const void* bytes, std::size_t size) {
  const char* p = static_cast<const char*>(bytes);
  while (size > 0) {
    const ssize_t n = write(fd, p, size);
    if (n < 0) {
      if (errno == EINTR) continue;
      return false;
    }
    p += n;
    size -= static_cast<std::size_t>(n);
  }
  return true;
}

void syncDirectory(const std::string& directory) {
  const int fd = open(directory.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (fd < 0) return;
  fsync(fd);
  close(fd);
}

void setError(std::string* error, const char* what) {
  if (error != nullptr) *error = std::string(what) + ": " + std::strerror(errno);
}

// Renames a complete temporary file over the final name; the temporary name
// is gone afterwards in every case.
bool moveIntoPlace(const std::string& temporary, int slot, const std::string& finalName,
                   std::string* error) {
  const bool moved = std::rename(temporary.c_str(), finalName.c_str()) == 0;
  if (!moved) {
    setError(error, "rename");
    unlink(temporary.c_str());
  }
  unregisterTemporary(slot);
  if (moved) syncDirectory(directoryOf(finalName));
  return moved;
}

// The unnamed way; 1 done, 0 failed, -1 not available here (nothing written).
int commitUnnamed(const std::string& finalName, const void* bytes, std::size_t size,
                  std::string* error) {
  const int fd = open(directoryOf(finalName).c_str(), O_TMPFILE | O_WRONLY | O_CLOEXEC, 0666);
  if (fd < 0) return -1;
  if (!writeAll(fd, bytes, size) || fsync(fd) != 0) {
    setError(error, "write");
    close(fd);
    return 0;
  }
  char link[64];
  std::snprintf(link, sizeof link, "/proc/self/fd/%d", fd);
  for (int attempt = 0; attempt < 100; ++attempt) {
    const std::string temporary = temporaryName(finalName);
    const int slot = registerTemporary(temporary);
    if (linkat(AT_FDCWD, link, AT_FDCWD, temporary.c_str(), AT_SYMLINK_FOLLOW) == 0) {
      close(fd);
      return moveIntoPlace(temporary, slot, finalName, error) ? 1 : 0;
    }
    const int linkError = errno;
    unregisterTemporary(slot);
    if (linkError != EEXIST) break;
  }
  close(fd);
  return -1;
}

bool commitNamed(const std::string& finalName, const void* bytes, std::size_t size,
                 std::string* error) {
  for (int attempt = 0; attempt < 100; ++attempt) {
    const std::string temporary = temporaryName(finalName);
    const int slot = registerTemporary(temporary);
    const int fd = open(temporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0666);
    if (fd < 0) {
      const int openError = errno;
      unregisterTemporary(slot);
      if (openError == EEXIST) continue;
      errno = openError;
      setError(error, "open");
      return false;
    }
    const bool written = writeAll(fd, bytes, size) && fsync(fd) == 0;
    if (!written) setError(error, "write");
    const bool closed = close(fd) == 0;
    if (!written || !closed) {
      unlink(temporary.c_str());
      unregisterTemporary(slot);
      return false;
    }
    return moveIntoPlace(temporary, slot, finalName, error);
  }
  if (error != nullptr) *error = "no free temporary name";
  return false;
}

}  // namespace

void grdRemoveTemporaryFiles() {
  for (TemporarySlot& slot : slots) {
    if (slot.used != 0) {
      unlink(slot.path);
      slot.used = 0;
    }
  }
}

std::string grdCreateProblem(const std::string& finalName) {
  if (finalName.empty()) return "no file name";
  if (finalName.back() == '/') return "the name ends in '/' (a directory)";
  struct stat info;
  if (stat(finalName.c_str(), &info) == 0 && S_ISDIR(info.st_mode)) return "is a directory";
  const std::string directory = directoryOf(finalName);
  if (stat(directory.c_str(), &info) != 0) return std::strerror(errno);
  if (!S_ISDIR(info.st_mode)) return directory + " is not a directory";
  if (access(directory.c_str(), W_OK | X_OK) != 0) return std::strerror(errno);
  return std::string();
}

bool grdCanCreate(const std::string& finalName) { return grdCreateProblem(finalName).empty(); }

bool grdCommitFile(const std::string& finalName, const void* bytes, std::size_t size,
                   std::string* error) {
  const std::string problem = grdCreateProblem(finalName);
  if (!problem.empty()) {
    if (error != nullptr) *error = problem;
    return false;
  }
  const int unnamed = commitUnnamed(finalName, bytes, size, error);
  if (unnamed >= 0) return unnamed == 1;
  return commitNamed(finalName, bytes, size, error);
}

}  // namespace karnet
