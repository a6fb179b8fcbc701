#ifndef KARNET_TESTS_PARAMS_PAR_TEST_UTIL_H_
#define KARNET_TESTS_PARAMS_PAR_TEST_UTIL_H_

#include <gtest/gtest.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <string>

namespace karnet::test {

// A fresh directory under the system's temporary directory, removed again
// with everything in it.
class TempDir {
 public:
  TempDir() {
    std::string pattern = (std::filesystem::temp_directory_path() / "karnet-par-XXXXXX").string();
    if (mkdtemp(pattern.data()) == nullptr) ADD_FAILURE() << "mkdtemp failed";
    path_ = pattern;
  }
  ~TempDir() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
  }
  TempDir(const TempDir&) = delete;
  TempDir& operator=(const TempDir&) = delete;

  const std::string& path() const { return path_; }
  std::string file(const std::string& name) const { return path_ + "/" + name; }

  // Writes text as it is (no line-end translation) and gives the path.
  std::string write(const std::string& name, const std::string& text) const {
    const std::string full = file(name);
    std::FILE* stream = std::fopen(full.c_str(), "wb");
    if (stream == nullptr) {
      ADD_FAILURE() << "cannot create " << full;
      return full;
    }
    std::fwrite(text.data(), 1, text.size(), stream);
    std::fclose(stream);
    return full;
  }

 private:
  std::string path_;
};

}  // namespace karnet::test

#endif  // KARNET_TESTS_PARAMS_PAR_TEST_UTIL_H_
