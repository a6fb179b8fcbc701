// Input files: a readable regular file or a reason in the user's words.
#include "support/file_check.h"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <string>

#include "common/temp_dir.h"

namespace karnet {
namespace {

namespace fs = std::filesystem;

TEST(FileCheck, ReadableRegularFilesOnly) {
  const test::TempDir dir;
  const std::string plain = dir.write("casts.txt", "1 2 -3 4\n");
  EXPECT_EQ(inputFileProblem(plain.c_str()), "");
  EXPECT_EQ(inputFileProblem(""), "no file name");
  EXPECT_EQ(inputFileProblem(nullptr), "no file name");
  EXPECT_EQ(inputFileProblem(dir.file("absent.txt").c_str()), "No such file or directory");
  EXPECT_EQ(inputFileProblem(dir.file("casts.txt/inner").c_str()), "Not a directory");
  EXPECT_EQ(inputFileProblem(dir.path().c_str()), "is a directory, not a regular file");
  ASSERT_EQ(mkfifo(dir.file("fifo").c_str(), 0600), 0);
  EXPECT_EQ(inputFileProblem(dir.file("fifo").c_str()), "not a regular file");
  EXPECT_EQ(inputFileProblem("/dev/zero"), "not a regular file");
  // A link is judged by what it leads to.
  fs::create_symlink(plain, dir.file("link.txt"));
  EXPECT_EQ(inputFileProblem(dir.file("link.txt").c_str()), "");
  fs::create_symlink(dir.file("gone.txt"), dir.file("dangling.txt"));
  EXPECT_EQ(inputFileProblem(dir.file("dangling.txt").c_str()), "No such file or directory");
  if (geteuid() != 0) {  // permissions do not bind root
    fs::permissions(plain, fs::perms::none);
    EXPECT_EQ(inputFileProblem(plain.c_str()), "Permission denied");
  }
}

}  // namespace
}  // namespace karnet
