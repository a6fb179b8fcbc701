#ifndef KARNET_TESTS_PARAMS_PAR_TEST_UTIL_H_
#define KARNET_TESTS_PARAMS_PAR_TEST_UTIL_H_

#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>

namespace karnet::test {

// A fresh directory under the system's temporary directory, removed again
// with everything in it.
class TempDir {
 public:
  TempDir() : path_((std::filesystem::temp_directory_path() / "karnet-par-XXXXXX").string()) {
    if (mkdtemp(path_.data()) == nullptr) ADD_FAILURE() << "mkdtemp failed";
  }
  ~TempDir() { std::filesystem::remove_all(path_, ignored_); }

  const std::string& path() const { return path_; }
  std::string file(const std::string& name) const { return path_ + "/" + name; }

  // Writes text as it is (no line-end translation) and gives the path.
  std::string write(const std::string& name, const std::string& text) const {
    std::ofstream(file(name), std::ios::binary) << text;
    return file(name);
  }

 private:
  std::string path_;
  std::error_code ignored_;
};

}  // namespace karnet::test

#endif  // KARNET_TESTS_PARAMS_PAR_TEST_UTIL_H_
