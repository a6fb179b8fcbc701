#ifndef KARNET_SUPPORT_FILE_DESCRIPTION_H_
#define KARNET_SUPPORT_FILE_DESCRIPTION_H_

#include <cstdint>

namespace karnet {

// The "no value" marker of every value field and of the result file.
inline constexpr float kDeleteValueFloat = -1e-30f;
// The same marker as a double (not the float widened; used for double fields).
inline constexpr double kDeleteValueDouble = -1e-30;

struct AxisDescription {
  float start;      // index of the first node
  float factor;     // multiplier of spacing
  float spacing;    // distance between nodes
  double origin;    // geographic longitude / latitude of the first node, or a height
  std::int32_t lastIndex;  // node count - 1
  char unit[12];
};

struct TimeAxisDescription {
  double start;
  std::int32_t firstStep;
  double step;
  double further;
  float startTime;  // seconds since midnight of the start date
  char unit[12];
};

struct ItemDescription {
  float values[8];  // values[1] and values[2]: the first two statistics (minimum, maximum)
  char name[24];
  std::int32_t integers[2];
};

// In-memory description of a gridded data file.
struct FileDescription {
  double misc[7];           // the "Q84_Misc" block: [0] orientation, [3] land value
  double dimension;
  double header[3];         // 1.0, 3.0, 0.0 for the result file
  double deleteValue;
  double startDate;
  char text20[20];
  std::int32_t integer20;
  AxisDescription axes[5];  // [1] x, [2] y, [3] z
  TimeAxisDescription timeAxis;
  std::int32_t itemCount;
  ItemDescription* items;   // itemCount + 1 slots, slot 0 unused
  char text12a[12];
  char text12b[12];
  char text1024[1024];
  unsigned char block41[41];
  std::int32_t lastInteger;
};

// New description (checked allocator); null when nothing could be allocated.
FileDescription* descriptionCreate(std::int32_t dimension, std::int32_t itemCount);
// descriptionCreate with 16 item slots.
FileDescription* descriptionNew(std::int32_t dimension);
// Releases the item table, then the record. Null is ignored.
void descriptionFree(FileDescription* description);

}  // namespace karnet

#endif  // KARNET_SUPPORT_FILE_DESCRIPTION_H_
