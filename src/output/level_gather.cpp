#include "output/level_gather.h"

#include <algorithm>

#include "control/ranks.h"
#include "state/run_state.h"

namespace karnet {

void extractResultLevel(const RunState& state, std::int32_t s, std::int32_t nx, std::int32_t ny,
                        float* out) {
  const FloatGrid3D& basic = state.basicValues;
  const auto empty = static_cast<float>(state.deleteValue());
  const LocalWindow& w = state.window;
  const std::int32_t lb = w.lOff + s;
  const std::int64_t nj = basic.nj, nk = basic.nk;
  const bool held = basic.data != nullptr && lb >= basic.l0 && lb < basic.l0 + basic.nl;
  // The window normally lies inside the basic grid; a part outside it is empty.
  const std::int64_t pLo = std::clamp<std::int64_t>(-std::int64_t{w.jOff}, 0, nx);
  const std::int64_t pHi = std::clamp<std::int64_t>(nj - w.jOff, pLo, nx);
  for (std::int64_t q = 0; q < ny; ++q) {
    float* row = out + q * nx;
    const std::int64_t kb = w.kOff + q;
    if (!held || kb < 0 || kb >= nk) {
      std::fill(row, row + nx, empty);
      continue;
    }
    const float* in = basic.data + basic.index(static_cast<std::int32_t>(w.jOff + pLo),
                                               static_cast<std::int32_t>(kb), lb);
    std::fill(row, row + pLo, empty);
    std::copy(in, in + (pHi - pLo), row + pLo);
    std::fill(row + pHi, row + nx, empty);
  }
}

LevelGather::LevelGather(const RunState& state, std::int32_t nx, std::int32_t ny, std::int32_t nz,
                         const FloatGrid3D* errors)
    : state_(state),
      nx_(nx),
      ny_(ny),
      nz_(nz),
      errors_(errors),
      taken_(static_cast<std::size_t>(nz) * 2, false) {}

void LevelGather::copyError(std::int32_t s, float* out) const {
  const std::int64_t layer = std::int64_t{nx_} * ny_;
  // The error field's level s comes from local level l0 + s of the grid.
  const std::int64_t at = std::int64_t{state_.window.l0} + s - errors_->l0;
  if (errors_->data == nullptr || errors_->layerSize() != layer || at < 0 || at >= errors_->nl) {
    std::fill(out, out + layer, static_cast<float>(state_.deleteValue()));
    return;
  }
  std::copy(errors_->data + at * layer, errors_->data + (at + 1) * layer, out);
}

void LevelGather::sendHeld() const {
  std::vector<float> level(static_cast<std::size_t>(std::int64_t{nx_} * ny_));
  const std::int32_t lOff = state_.window.lOff;
  for (int item = 1; item <= (errors_ != nullptr ? 2 : 1); ++item) {
    for (std::int32_t s = 0; s < nz_; ++s) {
      if (levelOwner(state_.levelOwners, lOff + s) != rankIndex()) continue;
      if (item == 1) {
        extractResultLevel(state_, s, nx_, ny_, level.data());
      } else {
        copyError(s, level.data());
      }
      ranksSendFloats(level.data(), level.size(), 0, (item - 1) * nz_ + s);
    }
  }
}

bool LevelGather::take(int item, std::int32_t s, float* buffer) {
  if (s < 0 || s >= nz_ || (item == 2 && errors_ == nullptr)) return false;
  const std::size_t slot = static_cast<std::size_t>((item - 1) * nz_ + s);
  const int owner = levelOwner(state_.levelOwners, state_.window.lOff + s);
  if (owner > 0 && !taken_[slot]) {
    ranksReceiveFloats(buffer, static_cast<std::size_t>(std::int64_t{nx_} * ny_), owner,
                       static_cast<int>(slot));
  } else if (item == 1) {
    extractResultLevel(state_, s, nx_, ny_, buffer);
  } else {
    copyError(s, buffer);
  }
  taken_[slot] = true;
  return true;
}

ResultLevelSource LevelGather::source() {
  return [this](std::int32_t s, float* buffer) { return take(1, s, buffer); };
}

ResultLevelSource LevelGather::errorSource() {
  return [this](std::int32_t s, float* buffer) { return take(2, s, buffer); };
}

void LevelGather::drain() {
  std::vector<float> level(static_cast<std::size_t>(std::int64_t{nx_} * ny_));
  for (int item = 1; item <= (errors_ != nullptr ? 2 : 1); ++item) {
    for (std::int32_t s = 0; s < nz_; ++s) {
      if (!taken_[static_cast<std::size_t>((item - 1) * nz_ + s)]) take(item, s, level.data());
    }
  }
}

}  // namespace karnet
