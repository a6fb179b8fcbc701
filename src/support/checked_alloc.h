#ifndef KARNET_SUPPORT_CHECKED_ALLOC_H_
#define KARNET_SUPPORT_CHECKED_ALLOC_H_

#include <cstdint>

namespace karnet {

// Guarded allocator used for every grid, description and work array.
// At most 512 blocks are live at a time; every block carries the guard words
// "1234" right before and "9876" right after its user area (which is aligned to
// 16 bytes). Failures never return: they throw a RunError whose message the
// run driver writes to stderr before it ends the run with exit code 1.
// Safe to call from several threads at once.
void* checkedAlloc(std::uint64_t size);
void checkedFree(void* p);

// Throws the RunError of the error code (its message for stderr, exit code 1).
// 0 no free slot, 1 out of memory, 2 unknown pointer, 3 low guard, 4 high guard.
[[noreturn]] void memoryError(int code, const void* p);

// Typed convenience: count elements of T from the checked allocator. A count
// whose byte size does not fit 64 bits ends the run as "Memory exhausted".
template <typename T>
T* checkedAllocArray(std::uint64_t count) {
  if (count > UINT64_MAX / sizeof(T)) memoryError(1, nullptr);
  return static_cast<T*>(checkedAlloc(count * sizeof(T)));
}

}  // namespace karnet

#endif  // KARNET_SUPPORT_CHECKED_ALLOC_H_
