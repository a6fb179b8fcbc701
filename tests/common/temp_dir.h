#ifndef KARNET_TESTS_COMMON_TEMP_DIR_H_
#define KARNET_TESTS_COMMON_TEMP_DIR_H_

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <stdexcept>
#include <string>
#include <system_error>

namespace karnet::test {

// A fresh directory under the system's temporary directory, removed again with everything
// in it (after giving back any permissions a test took away).
class TempDir {
 public:
  TempDir() : path_((std::filesystem::temp_directory_path() / "karnet-test-XXXXXX").string()) {
    if (mkdtemp(path_.data()) == nullptr) throw std::runtime_error("mkdtemp failed");
  }
  ~TempDir() {
    std::error_code ignored;
    std::filesystem::permissions(path_, std::filesystem::perms::owner_all,
                                 std::filesystem::perm_options::add, ignored);
    std::filesystem::remove_all(path_, ignored);
  }
  TempDir(const TempDir&) = delete;
  TempDir& operator=(const TempDir&) = delete;

  const std::string& path() const { return path_; }
  std::string file(const std::string& name) const { return path_ + "/" + name; }

  // Writes text as it is (no line-end translation) and gives the path.
  std::string write(const std::string& name, const std::string& text) const {
    std::ofstream(file(name), std::ios::binary) << text;
    return file(name);
  }

 private:
  std::string path_;
};

}  // namespace karnet::test

#endif  // KARNET_TESTS_COMMON_TEMP_DIR_H_
