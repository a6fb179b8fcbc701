#include "support/memory_limit.h"

#include <sys/resource.h>
#include <sys/sysinfo.h>

#include <algorithm>

namespace karnet {

std::uint64_t memoryLimitBytes() {
  std::uint64_t limit = UINT64_MAX;
  struct sysinfo info {};
  if (sysinfo(&info) == 0) {
    const std::uint64_t unit = info.mem_unit == 0 ? 1 : info.mem_unit;
    const std::uint64_t pages = static_cast<std::uint64_t>(info.totalram) +
                                static_cast<std::uint64_t>(info.totalswap);
    limit = byteSize(pages, unit);
  }
  for (int resource : {RLIMIT_AS, RLIMIT_DATA}) {
    struct rlimit r {};
    if (getrlimit(resource, &r) == 0 && r.rlim_cur != RLIM_INFINITY) {
      limit = std::min<std::uint64_t>(limit, r.rlim_cur);
    }
  }
  return limit;
}

std::uint64_t byteSize(std::uint64_t count, std::uint64_t size) {
  if (size != 0 && count > UINT64_MAX / size) return UINT64_MAX;
  return count * size;
}

}  // namespace karnet
