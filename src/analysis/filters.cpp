// Smoothing filters of the objective analysis.
#include "analysis/filters.h"

#include <cmath>
#include <cstring>

#include "support/checked_alloc.h"

namespace karnet {
namespace {

inline bool isHole(float cell, double deleteValue) {
  return static_cast<double>(cell) == deleteValue;
}

// Filters the run of count cells starting at first, step cells apart.
void filterRun(float* first, std::int64_t step, std::int32_t count, std::int32_t n, float kappa,
               float* lineBuffer) {
  for (std::int32_t i = 0; i < count; ++i) lineBuffer[i] = first[i * step];
  shapiroOperator(lineBuffer, count - 1, n);
  for (std::int32_t i = 0; i < count; ++i) {
    float& cell = first[i * step];
    cell = kappa * lineBuffer[i] + cell;
  }
}

// Filters every run of valid cells along one line of length cells, step apart.
void filterLine(float* line, std::int64_t step, std::int32_t length, std::int32_t n, float kappa,
                double deleteValue, float* lineBuffer) {
  std::int32_t runStart = -1;
  for (std::int32_t i = 0; i < length; ++i) {
    const bool hole = isHole(line[i * step], deleteValue);
    if (!hole && runStart < 0) {
      runStart = i;
    } else if (hole && runStart >= 0) {
      filterRun(line + runStart * step, step, i - runStart, n, kappa, lineBuffer);
      runStart = -1;
    }
  }
  if (runStart >= 0) {
    filterRun(line + runStart * step, step, length - runStart, n, kappa, lineBuffer);
  }
}

}  // namespace

void shapiroOperator(float* buffer, std::int32_t m, std::int32_t n) {
  if (m + 1 <= 2) {
    for (std::int32_t i = 0; i <= m; ++i) buffer[i] = 0.0f;
    return;
  }
  for (std::int32_t repeat = 0; repeat < n; ++repeat) {
    for (std::int32_t i = 0; i < m; ++i) buffer[i] = buffer[i + 1] - buffer[i];
    buffer[m] = -2.0f * buffer[m - 1];
    for (std::int32_t i = m - 1; i >= 1; --i) buffer[i] = buffer[i] - buffer[i - 1];
    buffer[0] = 2.0f * buffer[0];
  }
}

void shapiroFilter(float* data, std::int32_t nj, std::int32_t nk, std::int32_t n,
                   double deleteValue, float* lineBuffer) {
  const float sign = (n % 2 != 0) ? 1.0f : -1.0f;
  const auto power = static_cast<float>(std::pow(2.0, 2.0 * n));
  const float kappa = sign / power;

  // Columns (fixed j, k running), then rows (fixed k, j running).
  for (std::int32_t j = 0; j < nj; ++j) {
    filterLine(data + j, nj, nk, n, kappa, deleteValue, lineBuffer);
  }
  for (std::int32_t k = 0; k < nk; ++k) {
    filterLine(data + std::int64_t{k} * nj, 1, nj, n, kappa, deleteValue, lineBuffer);
  }
}

void twelvePointFilter(float* data, std::int32_t nj, std::int32_t nk, double deleteValue) {
  if (nj < 1 || nk < 1) return;
  const std::int64_t count = std::int64_t{nj} * nk;
  float* copy = checkedAllocArray<float>(static_cast<std::uint64_t>(count));
  std::memcpy(copy, data, static_cast<std::size_t>(count) * sizeof(float));

  for (std::int32_t j = 0; j < nj; ++j) {
    const std::int32_t jl = j > 0 ? j - 1 : 0;
    const std::int32_t jr = j + 1 < nj ? j + 1 : nj - 1;
    for (std::int32_t k = 0; k < nk; ++k) {
      const float z = copy[std::int64_t{k} * nj + j];
      if (isHole(z, deleteValue)) continue;
      const std::int32_t kl = k > 0 ? k - 1 : 0;
      const std::int32_t kh = k + 1 < nk ? k + 1 : nk - 1;
      // A hole among the neighbours counts as the centre value.
      auto value = [&](std::int32_t kk, std::int32_t jj) {
        const float v = copy[std::int64_t{kk} * nj + jj];
        return isHole(v, deleteValue) ? z : v;
      };
      float sum = value(kl, j) + value(kl, jl);
      sum = sum + value(kl, jr);
      sum = sum + value(k, jl);
      sum = sum + 4.0f * z;
      sum = sum + value(k, jr);
      sum = sum + value(kh, jl);
      sum = sum + value(kh, j);
      sum = sum + value(kh, jr);
      data[std::int64_t{k} * nj + j] = static_cast<float>(static_cast<double>(sum) / 12.0);
    }
  }
  checkedFree(copy);
}

}  // namespace karnet
