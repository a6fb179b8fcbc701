#ifndef KARNET_SUPPORT_MEMORY_LIMIT_H_
#define KARNET_SUPPORT_MEMORY_LIMIT_H_

#include <cstdint>

namespace karnet {

// The most memory this process could ever obtain: physical memory plus swap,
// lowered by the address-space and data-segment limits (ulimit -v, -d) when
// they are set. Requests above it cannot succeed, so they are refused before
// anything is allocated.
std::uint64_t memoryLimitBytes();

// The bytes of count elements of size bytes each, or UINT64_MAX when the
// product does not fit 64 bits.
std::uint64_t byteSize(std::uint64_t count, std::uint64_t size);

}  // namespace karnet

#endif  // KARNET_SUPPORT_MEMORY_LIMIT_H_
