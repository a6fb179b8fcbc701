#ifndef KARNET_OUTPUT_LEVEL_GATHER_H_
#define KARNET_OUTPUT_LEVEL_GATHER_H_

#include <cstdint>
#include <vector>

#include "output/result_write.h"

namespace karnet {

struct FloatGrid3D;
struct RunState;

// Copies local level s of the result (basic level lOff + s), the local grid's
// window of nx * ny nodes at (jOff, kOff), out of the held basic values;
// nodes the basic grid does not cover are empty.
void extractResultLevel(const RunState& state, std::int32_t s, std::int32_t nx, std::int32_t ny,
                        float* out);

// The result's levels in a run over several processes. Every process but the
// first sends the result levels it holds to the first, in increasing order;
// the first writes them as they come, its own levels taken from its grids.
class LevelGather {
 public:
  // nx, ny, nz: the result grid's node counts. errors, when given: the error
  // field of this process's levels (local levels errors->l0 on), which goes
  // the same way after the values.
  LevelGather(const RunState& state, std::int32_t nx, std::int32_t ny, std::int32_t nz,
              const FloatGrid3D* errors = nullptr);

  // Any process but the first: sends its levels, one message per level, then
  // those of its error field.
  void sendHeld() const;
  // The first process: the source of every level for the result writer.
  ResultLevelSource source();
  ResultLevelSource errorSource();
  // The first process after the writer, whether it took every level or
  // stopped early: takes the levels still on their way, so that no process
  // waits forever for its sends to be taken.
  void drain();

 private:
  // Level s of item 1 (values) or 2 (error field) into buffer.
  bool take(int item, std::int32_t s, float* buffer);
  // Level s of this process's error field.
  void copyError(std::int32_t s, float* out) const;

  const RunState& state_;
  std::int32_t nx_, ny_, nz_;
  const FloatGrid3D* errors_;
  std::vector<bool> taken_;  // item 1's levels, then item 2's
};

}  // namespace karnet

#endif  // KARNET_OUTPUT_LEVEL_GATHER_H_
