// The guarded allocator: block layout, slot reuse, and every way it ends a run.
#include "support/checked_alloc.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "control/log.h"
#include "control/termination.h"
#include "support/run_error.h"

namespace karnet {
namespace {

// Runs fn and ends the run for the error it throws, as the run driver does.
template <typename Fn>
void asTheDriver(Fn fn) {
  try {
    fn();
  } catch (const RunError& error) {
    endRun(error);
  }
}

using Bytes = unsigned char*;

TEST(CheckedAllocTest, UserAreaIsAlignedAndBracketedByGuardWords) {
  for (std::uint64_t size : {0u, 1u, 3u, 8u, 17u, 1000u}) {
    auto* p = static_cast<Bytes>(checkedAlloc(size));
    ASSERT_NE(p, nullptr);
    EXPECT_EQ(reinterpret_cast<std::uintptr_t>(p) % 16, 0u) << size;
    EXPECT_EQ(std::memcmp(p - 4, "1234", 4), 0) << size;
    EXPECT_EQ(std::memcmp(p + size, "9876", 4), 0) << size;
    std::memset(p, 0xAB, size);
    checkedFree(p);
  }
  // An array's size is its element count times the element size.
  auto* values = checkedAllocArray<double>(1000);
  EXPECT_EQ(std::memcmp(reinterpret_cast<Bytes>(values) + 8000, "9876", 4), 0);
  checkedFree(values);
}

// The block is made here; the damage and the free happen in the forked child.
TEST(CheckedAllocDeathTest, DamageAndBadPointersEndTheRunThroughTheReport) {
  GTEST_FLAG_SET(death_test_style, "fast");
  const std::string path = "/tmp/karnet_alloc_log" + std::to_string(getpid());
  struct Case {
    void (*act)(Bytes p);  // p: a live block of 10 bytes
    const char* message;   // a regular expression
    bool namesPointer;
  };
  const Case cases[] = {
      {[](Bytes p) { p[10] = 'x'; checkedFree(p); }, "Memory corrupted \\(high\\)", true},
      {[](Bytes p) { p[-1] = 0; checkedFree(p); }, "Memory corrupted \\(low\\)", true},
      {[](Bytes p) { checkedFree(p); std::fputs("freed\n", stderr); checkedFree(p); },
       "freed\nNot a valid pointer", false},
      {[](Bytes p) { checkedFree(p + 4); }, "Not a valid pointer", false},
      {[](Bytes) { checkedFree(nullptr); }, "Not a valid pointer", false},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.message);
    auto* p = static_cast<Bytes>(checkedAlloc(10));
    char pointer[64];
    std::snprintf(pointer, sizeof pointer, "; ptr = %p", static_cast<void*>(p));
    const std::string expected =
        std::string("^") + c.message + (c.namesPointer ? pointer : "") + "\n$";
    EXPECT_EXIT({ logSetStream(std::fopen(path.c_str(), "w")); asTheDriver([&] { c.act(p); }); },
                ::testing::ExitedWithCode(1), expected);
    checkedFree(p);
    // The message goes to standard error only; the log gets the report alone.
    std::ifstream in(path);
    const std::string log{std::istreambuf_iterator<char>(in), {}};
    EXPECT_EQ(log.rfind("\n--------------- RUN TIME INFORMATION", 0), 0u) << log;
    EXPECT_NE(log.find("-- Completion code : Abnormal\n"), std::string::npos) << log;
  }
  std::remove(path.c_str());
}

TEST(CheckedAllocDeathTest, RequestsThePlatformCannotServeEndTheRun) {
#ifdef KARNET_SANITIZED
  GTEST_SKIP() << "the address sanitizer reports failed allocations on its own";
#endif
  GTEST_FLAG_SET(death_test_style, "fast");
  EXPECT_EXIT(asTheDriver([] { checkedAlloc(UINT64_MAX); }), ::testing::ExitedWithCode(1),
              "^Memory exhausted\n$");
  // An element count whose byte size does not fit 64 bits does not wrap around.
  EXPECT_EXIT(asTheDriver([] { checkedAllocArray<double>(UINT64_MAX / 4); }),
              ::testing::ExitedWithCode(1),
              "^Memory exhausted\n$");
}

// These need an allocator nobody has used yet: each runs in a fresh process.
TEST(CheckedAllocDeathTest, TableLimitAndQ84DebugInAFreshProcess) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_EXIT(
      asTheDriver([] {
        std::vector<void*> blocks;
        for (int i = 0; i < 512; ++i) blocks.push_back(checkedAlloc(8));
        checkedFree(blocks[100]);
        blocks[100] = checkedAlloc(8);  // the freed slot serves again
        std::fputs("512 live\n", stderr);
        checkedAlloc(8);
      }),
      ::testing::ExitedWithCode(1), "^512 live\nNo free slots for memeory allocation\n$");
  // Q84DEBUG, even when empty, fills every new block.
  EXPECT_EXIT(
      {
        setenv("Q84DEBUG", "", 1);
        constexpr std::size_t kLarge = 4 << 20;  // comes as fresh zero pages unless filled
        auto* large = static_cast<Bytes>(checkedAlloc(kLarge));
        const bool filled =
            large[0] == 0xFF && large[kLarge / 2] == 0xFF && large[kLarge - 1] == 0xFF;
        std::fputs(filled ? "filled\n" : "not filled\n", stderr);
        std::exit(0);
      },
      ::testing::ExitedWithCode(0), "^filled\n$");
}

}  // namespace
}  // namespace karnet
