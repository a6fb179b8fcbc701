// Guarded allocator: a fixed table of live blocks, guard words around every
// block, and a run-ending message on any misuse.
#include "support/checked_alloc.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <mutex>

#include "support/run_error.h"

namespace karnet {
namespace {

constexpr int kSlotCount = 512;
constexpr std::uint64_t kAlignment = 16;
constexpr std::uint64_t kGuardSize = 4;
// Room for the low guard, the alignment padding and the high guard.
constexpr std::uint64_t kOverhead = kGuardSize + (kAlignment - 1) + kGuardSize;
constexpr char kLowGuard[kGuardSize] = {'1', '2', '3', '4'};
constexpr char kHighGuard[kGuardSize] = {'9', '8', '7', '6'};

struct Slot {
  unsigned char* user;   // user area handed out; null when the slot is free
  void* block;           // what the platform allocator gave
  std::uint64_t size;    // user size + 8, the two guard words included
};

// Process-wide table of live blocks. Every slot below firstFree is in use, and
// no slot at or above slotEnd has ever been used, so both scans stay short while
// keeping the lowest-free-slot rule. Layers are analysed on several threads at
// once, so every look at the table holds its lock.
struct SlotTable {
  std::mutex lock;
  bool firstUse = true;
  bool fill = false;
  int firstFree = 0;
  int slotEnd = 0;
  Slot slots[kSlotCount];
};

SlotTable table;

}  // namespace

void* checkedAlloc(std::uint64_t size) {
  const std::lock_guard<std::mutex> guard(table.lock);
  if (table.firstUse) {
    table.firstUse = false;
    for (Slot& slot : table.slots) slot = Slot{nullptr, nullptr, 0};
    table.fill = std::getenv("Q84DEBUG") != nullptr;
  }

  int index = table.firstFree;
  while (index < kSlotCount && table.slots[index].user != nullptr) ++index;
  if (index == kSlotCount) memoryError(0, nullptr);

  if (size > UINT64_MAX - kOverhead) memoryError(1, nullptr);
  const std::uint64_t blockSize = size + kOverhead;
  if (blockSize > SIZE_MAX) memoryError(1, nullptr);
  auto* block = static_cast<unsigned char*>(std::malloc(static_cast<std::size_t>(blockSize)));
  if (block == nullptr) memoryError(1, nullptr);
  if (table.fill) std::memset(block, 0xFF, static_cast<std::size_t>(blockSize));

  // The user area starts at the first 16-byte boundary that leaves room for the
  // low guard word in front of it.
  const auto start = reinterpret_cast<std::uintptr_t>(block) + kGuardSize;
  const std::uintptr_t aligned = (start + (kAlignment - 1)) & ~std::uintptr_t{kAlignment - 1};
  unsigned char* user = block + (aligned - reinterpret_cast<std::uintptr_t>(block));
  std::memcpy(user - kGuardSize, kLowGuard, kGuardSize);
  std::memcpy(user + size, kHighGuard, kGuardSize);

  table.slots[index] = Slot{user, block, size + 2 * kGuardSize};
  table.firstFree = index + 1;
  if (index >= table.slotEnd) table.slotEnd = index + 1;
  return user;
}

void checkedFree(void* p) {
  const std::lock_guard<std::mutex> guard(table.lock);
  int index = 0;
  if (p != nullptr) {
    while (index < table.slotEnd && table.slots[index].user != p) ++index;
  }
  if (p == nullptr || index == table.slotEnd) memoryError(2, p);

  Slot& slot = table.slots[index];
  if (std::memcmp(slot.user - kGuardSize, kLowGuard, kGuardSize) != 0) memoryError(3, p);
  if (std::memcmp(slot.user + (slot.size - 2 * kGuardSize), kHighGuard, kGuardSize) != 0) {
    memoryError(4, p);
  }
  std::free(slot.block);
  slot = Slot{nullptr, nullptr, 0};
  if (index < table.firstFree) table.firstFree = index;
}

void memoryError(int code, const void* p) {
  char text[96];
  switch (code) {
    case 0:
      std::snprintf(text, sizeof text, "No free slots for memeory allocation\n");
      break;
    case 1:
      std::snprintf(text, sizeof text, "Memory exhausted\n");
      break;
    case 2:
      std::snprintf(text, sizeof text, "Not a valid pointer\n");
      break;
    case 3:
      std::snprintf(text, sizeof text, "Memory corrupted (low); ptr = %p\n", const_cast<void*>(p));
      break;
    case 4:
      std::snprintf(text, sizeof text, "Memory corrupted (high); ptr = %p\n",
                    const_cast<void*>(p));
      break;
    default:
      std::snprintf(text, sizeof text, "unknown memory failure\n");
      break;
  }
  throw RunError::memory(text);
}

}  // namespace karnet
