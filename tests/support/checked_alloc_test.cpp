// The guarded allocator: block layout, slot reuse, and every way it ends a run.
#include "support/checked_alloc.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include "control/log.h"

namespace karnet {
namespace {

std::string pointerText(const void* p) {
  char text[64];
  std::snprintf(text, sizeof text, "%p", const_cast<void*>(p));
  return text;
}

std::string readFile(const std::string& path) {
  std::ifstream in(path);
  std::stringstream content;
  content << in.rdbuf();
  return content.str();
}

TEST(CheckedAllocTest, UserAreaIsAlignedAndBracketedByGuardWords) {
  for (std::uint64_t size : {0u, 1u, 3u, 8u, 17u, 1000u}) {
    auto* p = static_cast<unsigned char*>(checkedAlloc(size));
    ASSERT_NE(p, nullptr);
    EXPECT_EQ(reinterpret_cast<std::uintptr_t>(p) % 16, 0u) << size;
    EXPECT_EQ(std::memcmp(p - 4, "1234", 4), 0) << size;
    EXPECT_EQ(std::memcmp(p + size, "9876", 4), 0) << size;
    std::memset(p, 0xAB, size);
    checkedFree(p);
  }
}

TEST(CheckedAllocTest, FreedSlotsServeLaterRequests) {
  // Far more allocations than slots: only works when every free releases its slot.
  std::vector<void*> live;
  for (int round = 0; round < 40; ++round) {
    for (int i = 0; i < 100; ++i) live.push_back(checkedAlloc(24));
    // Free in an order other than the allocation order.
    for (std::size_t i = live.size(); i-- > 0;) checkedFree(live[i]);
    live.clear();
  }
  SUCCEED();
}

TEST(CheckedAllocTest, ArraysHoldTheirElementCount) {
  auto* values = checkedAllocArray<double>(1000);
  for (int i = 0; i < 1000; ++i) values[i] = i * 0.5;
  EXPECT_EQ(std::memcmp(reinterpret_cast<unsigned char*>(values) + 8000, "9876", 4), 0);
  EXPECT_EQ(values[999], 499.5);
  checkedFree(values);
}

// The guard and pointer checks: the block is made here, the damage and the
// free happen in the forked child, so the reported pointer is known.
class CheckedFreeDeathTest : public ::testing::Test {
 protected:
  void SetUp() override { GTEST_FLAG_SET(death_test_style, "fast"); }
};

TEST_F(CheckedFreeDeathTest, WritingPastTheEndIsCaughtAtFree) {
  auto* p = static_cast<unsigned char*>(checkedAlloc(10));
  EXPECT_EXIT(
      {
        p[10] = 'x';
        checkedFree(p);
      },
      ::testing::ExitedWithCode(1), "Memory corrupted \\(high\\); ptr = " + pointerText(p) + "\n");
  checkedFree(p);
}

TEST_F(CheckedFreeDeathTest, WritingBeforeTheStartIsCaughtAtFree) {
  auto* p = static_cast<unsigned char*>(checkedAlloc(10));
  EXPECT_EXIT(
      {
        p[-1] = 0;
        checkedFree(p);
      },
      ::testing::ExitedWithCode(1), "Memory corrupted \\(low\\); ptr = " + pointerText(p) + "\n");
  checkedFree(p);
}

TEST_F(CheckedFreeDeathTest, LowGuardIsCheckedBeforeHighGuard) {
  auto* p = static_cast<unsigned char*>(checkedAlloc(4));
  EXPECT_EXIT(
      {
        p[-4] = 0;
        p[4] = 0;
        checkedFree(p);
      },
      ::testing::ExitedWithCode(1), "\\(low\\)");
  checkedFree(p);
}

TEST_F(CheckedFreeDeathTest, SecondFreeOfABlockIsNotAValidPointer) {
  void* p = checkedAlloc(32);
  EXPECT_EXIT(
      {
        checkedFree(p);
        std::fputs("first free done\n", stderr);
        checkedFree(p);
      },
      ::testing::ExitedWithCode(1), "first free done\nNot a valid pointer\n");
  checkedFree(p);
}

TEST_F(CheckedFreeDeathTest, PointersNotFromTheAllocatorAreRejected) {
  int onStack = 0;
  EXPECT_EXIT(checkedFree(&onStack), ::testing::ExitedWithCode(1), "^Not a valid pointer\n$");
  EXPECT_EXIT(checkedFree(nullptr), ::testing::ExitedWithCode(1), "^Not a valid pointer\n$");
  // An address inside a live block is not the block's pointer.
  auto* p = static_cast<unsigned char*>(checkedAlloc(16));
  EXPECT_EXIT(checkedFree(p + 4), ::testing::ExitedWithCode(1), "^Not a valid pointer\n$");
  checkedFree(p);
}

TEST_F(CheckedFreeDeathTest, RequestsThePlatformCannotServeEndTheRun) {
#ifdef KARNET_SANITIZED
  GTEST_SKIP() << "the address sanitizer reports failed allocations on its own";
#endif
  EXPECT_EXIT(checkedAlloc(UINT64_MAX), ::testing::ExitedWithCode(1), "^Memory exhausted\n$");
  EXPECT_EXIT(checkedAlloc(std::uint64_t{1} << 52), ::testing::ExitedWithCode(1),
              "^Memory exhausted\n$");
  // An element count whose byte size does not fit 64 bits does not wrap around.
  EXPECT_EXIT(checkedAllocArray<double>(UINT64_MAX / 4), ::testing::ExitedWithCode(1),
              "^Memory exhausted\n$");
}

TEST_F(CheckedFreeDeathTest, ErrorsEndTheRunThroughTheRunTimeReport) {
  char path[] = "/tmp/karnet_alloc_logXXXXXX";
  const int fd = mkstemp(path);
  ASSERT_GE(fd, 0);
  close(fd);
  EXPECT_EXIT(
      {
        logSetStream(std::fopen(path, "w"));
        checkedFree(nullptr);
      },
      ::testing::ExitedWithCode(1), "Not a valid pointer");
  const std::string log = readFile(path);
  // The allocator's message goes to stderr only; the log gets the report.
  EXPECT_EQ(log.find("Not a valid pointer"), std::string::npos) << log;
  EXPECT_NE(log.find("-- Completion code : Abnormal\n"), std::string::npos) << log;
  std::remove(path);
}

TEST_F(CheckedFreeDeathTest, UnknownErrorCodesHaveTheirOwnMessage) {
  EXPECT_EXIT(memoryError(7, nullptr), ::testing::ExitedWithCode(1), "^unknown memory failure\n$");
}

// Tests that need an allocator nobody has used yet run in a fresh process.
class FreshAllocatorDeathTest : public ::testing::Test {
 protected:
  void SetUp() override { GTEST_FLAG_SET(death_test_style, "threadsafe"); }
};

TEST_F(FreshAllocatorDeathTest, At512LiveBlocksTheTableIsFull) {
  EXPECT_EXIT(
      {
        std::vector<void*> blocks;
        for (int i = 0; i < 512; ++i) blocks.push_back(checkedAlloc(8));
        checkedFree(blocks[100]);
        blocks[100] = checkedAlloc(8);  // the freed slot serves again
        std::fputs("512 live\n", stderr);
        checkedAlloc(8);
      },
      ::testing::ExitedWithCode(1), "^512 live\nNo free slots for memeory allocation\n$");
}

TEST_F(FreshAllocatorDeathTest, Q84DebugFillsNewBlocksAndIsReadOnce) {
  EXPECT_EXIT(
      {
        setenv("Q84DEBUG", "", 1);
        auto* first = static_cast<unsigned char*>(checkedAlloc(64));
        unsetenv("Q84DEBUG");
        // A large block comes as fresh zero pages from the system unless filled.
        constexpr std::size_t kLarge = 4 << 20;
        auto* large = static_cast<unsigned char*>(checkedAlloc(kLarge));
        bool filled = true;
        for (int i = 0; i < 64; ++i) filled = filled && first[i] == 0xFF;
        for (std::size_t i = 0; i < kLarge; i += 4093) filled = filled && large[i] == 0xFF;
        filled = filled && large[kLarge - 1] == 0xFF;
        std::fputs(filled ? "filled\n" : "not filled\n", stderr);
        std::exit(0);
      },
      ::testing::ExitedWithCode(0), "^filled\n$");
}

TEST_F(FreshAllocatorDeathTest, Q84DebugSetAfterTheFirstBlockHasNoEffect) {
  EXPECT_EXIT(
      {
        unsetenv("Q84DEBUG");
        checkedAlloc(16);
        setenv("Q84DEBUG", "1", 1);
        constexpr std::size_t kLarge = 4 << 20;
        auto* large = static_cast<unsigned char*>(checkedAlloc(kLarge));
        std::fputs(large[kLarge / 2] == 0xFF ? "filled\n" : "not filled\n", stderr);
        std::exit(0);
      },
      ::testing::ExitedWithCode(0), "^not filled\n$");
}

}  // namespace
}  // namespace karnet
