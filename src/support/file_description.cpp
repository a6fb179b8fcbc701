// Creation and release of gridded-file descriptions.
#include "support/file_description.h"

#include <cstring>

#include "support/checked_alloc.h"

namespace karnet {
namespace {

constexpr std::int32_t kDefaultItemCount = 16;

void clearAxis(AxisDescription& axis) {
  axis.start = kDeleteValueFloat;
  axis.factor = kDeleteValueFloat;
  axis.spacing = kDeleteValueFloat;
  axis.origin = kDeleteValueDouble;
  axis.lastIndex = 0;
  std::memset(axis.unit, 0, sizeof axis.unit);
}

void clearTimeAxis(TimeAxisDescription& axis) {
  axis.start = kDeleteValueDouble;
  axis.firstStep = 0;
  axis.step = kDeleteValueDouble;
  axis.further = kDeleteValueDouble;
  axis.startTime = kDeleteValueFloat;
  std::memset(axis.unit, 0, sizeof axis.unit);
}

void clearItem(ItemDescription& item) {
  for (float& value : item.values) value = kDeleteValueFloat;
  std::memset(item.name, 0, sizeof item.name);
  item.integers[0] = 0;
  item.integers[1] = 0;
}

}  // namespace

FileDescription* descriptionCreate(std::int32_t dimension, std::int32_t itemCount) {
  // A negative item count has no table to allocate; the caller sees "none".
  if (itemCount < 0) return nullptr;
  auto* description = checkedAllocArray<FileDescription>(1);
  if (description == nullptr) return nullptr;

  description->deleteValue = kDeleteValueDouble;
  description->dimension =
      (dimension >= 0 && dimension <= 4) ? static_cast<double>(dimension) : kDeleteValueDouble;
  for (double& value : description->misc) value = kDeleteValueDouble;
  for (double& value : description->header) value = kDeleteValueDouble;
  description->startDate = kDeleteValueDouble;
  std::memset(description->text20, 0, sizeof description->text20);
  description->integer20 = 0;

  for (AxisDescription& axis : description->axes) clearAxis(axis);
  clearTimeAxis(description->timeAxis);

  description->itemCount = itemCount;
  description->items =
      checkedAllocArray<ItemDescription>(static_cast<std::uint64_t>(itemCount) + 1);
  for (std::int32_t i = 0; i <= itemCount; ++i) clearItem(description->items[i]);

  std::memset(description->text12a, 0, sizeof description->text12a);
  std::memset(description->text12b, 0, sizeof description->text12b);
  std::memset(description->text1024, 0, sizeof description->text1024);
  std::memset(description->block41, 0, sizeof description->block41);
  description->lastInteger = 0;
  return description;
}

FileDescription* descriptionNew(std::int32_t dimension) {
  return descriptionCreate(dimension, kDefaultItemCount);
}

void descriptionFree(FileDescription* description) {
  if (description == nullptr) return;
  if (description->items != nullptr) checkedFree(description->items);
  checkedFree(description);
}

}  // namespace karnet
