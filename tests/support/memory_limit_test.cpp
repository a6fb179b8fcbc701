// The memory limit that grids are checked against before they are allocated.
#include "support/memory_limit.h"

#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/sysinfo.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdint>

namespace karnet {
namespace {

TEST(MemoryLimit, ByteSizesSaturateInsteadOfWrapping) {
  EXPECT_EQ(byteSize(0, 4), 0u);
  EXPECT_EQ(byteSize(2147483647, 4), 8589934588u);
  EXPECT_EQ(byteSize(UINT64_MAX / 4, 4), UINT64_MAX / 4 * 4);
  EXPECT_EQ(byteSize(UINT64_MAX / 4 + 1, 4), UINT64_MAX);
  EXPECT_EQ(byteSize(std::uint64_t{1} << 40, std::uint64_t{1} << 30), UINT64_MAX);
}

TEST(MemoryLimit, PhysicalMemoryIsTheCeiling) {
  struct sysinfo info {};
  ASSERT_EQ(sysinfo(&info), 0);
  const std::uint64_t physical =
      (static_cast<std::uint64_t>(info.totalram) + info.totalswap) * info.mem_unit;
  EXPECT_LE(memoryLimitBytes(), physical);
  EXPECT_GT(memoryLimitBytes(), 0u);
}

// Each limit is set in a child process, which reports whether memoryLimitBytes followed it.
TEST(MemoryLimit, AddressSpaceAndDataLimitsLowerIt) {
  for (int resource : {RLIMIT_AS, RLIMIT_DATA}) {
    SCOPED_TRACE(resource);
    const pid_t pid = fork();
    ASSERT_GE(pid, 0);
    if (pid == 0) {
      struct rlimit r {};
      getrlimit(resource, &r);
      const rlim_t wanted = 123456789;
      r.rlim_cur = r.rlim_max == RLIM_INFINITY || r.rlim_max > wanted ? wanted : r.rlim_max;
      if (setrlimit(resource, &r) != 0) _exit(2);
      _exit(memoryLimitBytes() == r.rlim_cur ? 0 : 1);
    }
    int status = 0;
    ASSERT_EQ(waitpid(pid, &status, 0), pid);
    ASSERT_TRUE(WIFEXITED(status));
    EXPECT_EQ(WEXITSTATUS(status), 0);
  }
}

}  // namespace
}  // namespace karnet
