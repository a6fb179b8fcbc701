#ifndef KARNET_TESTS_FUZZ_MEMORY_FILE_H_
#define KARNET_TESTS_FUZZ_MEMORY_FILE_H_

#include <sys/mman.h>
#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>

namespace karnet::fuzz {

// The fuzz input as a regular file without touching the disk: an anonymous
// memory file, reached by path through /proc/self/fd.
class MemoryFile {
 public:
  MemoryFile(const std::uint8_t* data, std::size_t size) {
    fd_ = memfd_create("karnet-fuzz", MFD_CLOEXEC);
    if (fd_ < 0) std::abort();
    std::size_t done = 0;
    while (done < size) {
      const ssize_t n = write(fd_, data + done, size - done);
      if (n <= 0) std::abort();
      done += static_cast<std::size_t>(n);
    }
    path_ = "/proc/self/fd/" + std::to_string(fd_);
  }
  ~MemoryFile() { close(fd_); }
  MemoryFile(const MemoryFile&) = delete;
  MemoryFile& operator=(const MemoryFile&) = delete;

  const char* path() const { return path_.c_str(); }

 private:
  int fd_ = -1;
  std::string path_;
};

}  // namespace karnet::fuzz

#endif  // KARNET_TESTS_FUZZ_MEMORY_FILE_H_
