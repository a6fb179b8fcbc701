// The optimal-interpolation estimator of one node.
#include "analysis/objan.h"

#include <algorithm>

#if defined(__x86_64__) && defined(__GNUC__)
#include <immintrin.h>
#endif

#include "analysis/correlation.h"
#include "analysis/invmtx.h"
#include "analysis/row_sums.h"

namespace karnet {

namespace {

void fillScalar(OaWorkspace& ws, std::int32_t m, double errorTerm) {
  const std::int64_t stride = ws.limit;
  float* a = ws.matrix;
  for (std::int32_t i = 0; i < m; ++i) {
    for (std::int32_t j = i; j < m; ++j) {
      const float dy = ws.selY[i] - ws.selY[j];
      const float dx = ws.selX[i] - ws.selX[j];
      const float d2 = dy * dy + dx * dx;
      const float rho = tabledCorrelation(d2, ws);
      a[j * stride + i] = rho;
      a[i * stride + j] = rho;
    }
    float& diagonal = a[i * stride + i];
    diagonal = static_cast<float>(errorTerm + static_cast<double>(diagonal));
  }
}

#if defined(__x86_64__) && defined(__GNUC__)
#define KARNET_FILL_AVX2 1
// Whole rows, eight entries at a time. Entry (i, j) and entry (j, i) have the
// same squared distance (the differences only change sign), so each row is
// computed in full instead of being mirrored. Correlations come from the table
// by a gather when every lane's squared distance is one of its entries, else
// lane by lane as tabledCorrelation takes them.
[[gnu::target("avx2")]] void fillAvx2(OaWorkspace& ws, std::int32_t m, double errorTerm) {
  const std::int64_t stride = ws.limit;
  float* a = ws.matrix;
  const __m256 tableEnd = _mm256_set1_ps(static_cast<float>(ws.corrTableSize));
  const __m256 zero = _mm256_setzero_ps();
  const __m256i lanes = _mm256_setr_epi32(0, 1, 2, 3, 4, 5, 6, 7);
  for (std::int32_t i = 0; i < m; ++i) {
    const __m256 yi = _mm256_set1_ps(ws.selY[i]);
    const __m256 xi = _mm256_set1_ps(ws.selX[i]);
    float* row = a + i * stride;
    for (std::int32_t j = 0; j < m; j += 8) {
      const __m256i inside = _mm256_cmpgt_epi32(_mm256_set1_epi32(m - j), lanes);
      const __m256 dy = _mm256_sub_ps(yi, _mm256_maskload_ps(ws.selY + j, inside));
      const __m256 dx = _mm256_sub_ps(xi, _mm256_maskload_ps(ws.selX + j, inside));
      const __m256 d2 = _mm256_add_ps(_mm256_mul_ps(dy, dy), _mm256_mul_ps(dx, dx));
      const __m256i index = _mm256_cvttps_epi32(d2);
      const __m256 tabled =
          _mm256_and_ps(_mm256_and_ps(_mm256_cmp_ps(d2, zero, _CMP_GE_OQ),
                                      _mm256_cmp_ps(d2, tableEnd, _CMP_LT_OQ)),
                        _mm256_cmp_ps(_mm256_cvtepi32_ps(index), d2, _CMP_EQ_OQ));
      const int wanted = _mm256_movemask_ps(_mm256_castsi256_ps(inside));
      if ((_mm256_movemask_ps(tabled) & wanted) == wanted) {
        const __m256 rho = _mm256_mask_i32gather_ps(zero, ws.corrTable, index,
                                                     _mm256_castsi256_ps(inside), 4);
        // A full store where the row has room for it: the lanes beyond the
        // block hold zeros in columns that nothing reads, and the diagonal
        // entry read back below comes straight from the store.
        if (j + 8 <= stride) {
          _mm256_storeu_ps(row + j, rho);
        } else {
          _mm256_maskstore_ps(row + j, inside, rho);
        }
      } else {
        alignas(32) float d[8];
        _mm256_store_ps(d, d2);
        for (std::int32_t q = 0; q < 8 && j + q < m; ++q) row[j + q] = tabledCorrelation(d[q], ws);
      }
    }
    row[i] = static_cast<float>(errorTerm + static_cast<double>(row[i]));
  }
}
#endif

}  // namespace

void fillCorrelationMatrix(OaWorkspace& ws, std::int32_t m, const RunSettings& settings,
                           bool vectorised) {
  const double errorTerm = static_cast<double>(settings.ErrorVariance) * 0.01;
#ifdef KARNET_FILL_AVX2
  static const bool hasAvx2 = __builtin_cpu_supports("avx2");
  if (vectorised && hasAvx2) {
    fillAvx2(ws, m, errorTerm);
    return;
  }
#else
  (void)vectorised;
#endif
  fillScalar(ws, m, errorTerm);
}

std::int32_t buildCorrelationMatrix(OaWorkspace& ws, std::int32_t m, const RunSettings& settings) {
  float det = 0.0f;
  // A block that the matrix cannot hold is not filled; the inversion refuses it.
  if (m <= ws.limit) fillCorrelationMatrix(ws, m, settings);
  return INVMTX(ws, ws.matrix, m, det) != 0 ? -1 : 0;
}

void removeWeightedMean(const OaWorkspace& ws, const float* a, float* values, std::int32_t n,
                        float& mean, float& weightSum) {
  // The row sums and row products are added to the totals in row order, as a
  // sum over stored row results would be.
  float* rowSum = ws.rowSums;
  float* rowDot = ws.rowProducts;
  floatRowSums(a, ws.limit, values, n, n, rowSum, rowDot);
  float total = 0.0f;
  float weighted = 0.0f;
  for (std::int32_t i = 0; i < n; ++i) {
    total = total + rowSum[i];
    weighted = weighted + rowDot[i];
  }
  mean = weighted / total;
  weightSum = total;
  for (std::int32_t i = 0; i < n; ++i) values[i] = values[i] - mean;
}

namespace {

// Room for the inverses of one line: at most this many bytes of cells and
// values (a line of L-like nodes keeps about 1 MiB).
constexpr std::size_t kCacheBytes = std::size_t{4} << 20;

std::uint64_t cellsHash(const std::int32_t* cells, std::int32_t m) {
  std::uint64_t h = 0x9e3779b97f4a7c15ull ^ static_cast<std::uint64_t>(m);
  for (std::int32_t i = 0; i < m; ++i) {
    h ^= static_cast<std::uint32_t>(cells[i]);
    h *= 0xff51afd7ed558ccdull;
    h ^= h >> 29;
  }
  return h;
}

bool sameCells(const KeptInverse& e, const std::int32_t* cells, std::int32_t m) {
  if (e.count != m) return false;
  // Lists are short: a plain loop beats a call to memcmp.
  for (std::int32_t i = 0; i < m; ++i) {
    if (e.cells[i] != cells[i]) return false;
  }
  return true;
}

}  // namespace

InverseCache::InverseCache(std::int32_t limit, std::int64_t lineNodes, bool keepMatrices)
    : keepMatrices_(keepMatrices) {
  const std::int32_t most = std::max(limit, 1);
  const std::size_t perEntry =
      sizeof(std::int32_t) * static_cast<std::size_t>(most) + sizeof(float) * entryFloats(most);
  const auto wanted = static_cast<std::size_t>(std::max<std::int64_t>(lineNodes, 0)) + 1;
  maxEntries_ = std::clamp<std::size_t>(kCacheBytes / perEntry, 1, wanted);
  std::size_t slots = 4;
  while (slots < 2 * maxEntries_) slots *= 2;
  cellsRoom_ = maxEntries_ * static_cast<std::size_t>(most);
  valuesRoom_ = maxEntries_ * entryFloats(most);
  for (Generation& g : generations_) {
    g.entries.reserve(maxEntries_);
    // Only what is kept is ever touched.
    g.cells = std::make_unique_for_overwrite<std::int32_t[]>(cellsRoom_);
    g.values = std::make_unique_for_overwrite<float[]>(valuesRoom_);
    g.slots.assign(slots, 0);
  }
}

std::size_t InverseCache::entryFloats(std::int32_t m) const {
  const auto count = static_cast<std::size_t>(m);
  return count * (keepMatrices_ ? count + 1 : 1);
}

void InverseCache::clear(Generation& g) {
  if (g.entries.empty()) return;
  g.entries.clear();
  g.cellsUsed = 0;
  g.valuesUsed = 0;
  std::fill(g.slots.begin(), g.slots.end(), 0u);
}

void InverseCache::startLine() {
  current_ ^= 1;
  clear(generations_[current_]);
  last_ = nullptr;
}

KeptInverse* InverseCache::lookUp(Generation& g, const std::int32_t* cells, std::int32_t m,
                                  std::uint64_t hash) {
  const std::size_t mask = g.slots.size() - 1;
  for (std::size_t at = hash & mask; g.slots[at] != 0; at = (at + 1) & mask) {
    KeptInverse& e = g.entries[g.slots[at] - 1];
    if (e.hash == hash && sameCells(e, cells, m)) return &e;
  }
  return nullptr;
}

KeptInverse* InverseCache::add(Generation& g, const std::int32_t* cells, std::int32_t m,
                               std::uint64_t hash) {
  const auto count = static_cast<std::size_t>(m);
  const std::size_t floats = entryFloats(m);
  // The entries never outgrow their reserved room, so none of them moves.
  if (g.entries.size() == maxEntries_ || g.cellsUsed + count > cellsRoom_ ||
      g.valuesUsed + floats > valuesRoom_) {
    return nullptr;
  }
  KeptInverse& e = g.entries.emplace_back();
  e.count = m;
  e.hash = hash;
  e.cells = g.cells.get() + g.cellsUsed;
  std::copy(cells, cells + m, e.cells);
  g.cellsUsed += count;
  e.products = g.values.get() + g.valuesUsed;
  e.inverse = keepMatrices_ ? e.products + m : nullptr;
  g.valuesUsed += floats;
  const std::size_t mask = g.slots.size() - 1;
  std::size_t at = hash & mask;
  while (g.slots[at] != 0) at = (at + 1) & mask;
  g.slots[at] = static_cast<std::uint32_t>(g.entries.size());
  return &e;
}

KeptInverse* InverseCache::find(const std::int32_t* cells, std::int32_t m) {
  if (last_ != nullptr && sameCells(*last_, cells, m)) {
    ++reused;
    return last_;
  }
  const std::uint64_t hash = cellsHash(cells, m);
  KeptInverse* found = lookUp(generations_[current_], cells, m, hash);
  if (found == nullptr) {
    KeptInverse* earlier = lookUp(generations_[current_ ^ 1], cells, m, hash);
    if (earlier == nullptr) return nullptr;
    // Carried over into this line, so that the next line still finds it.
    found = earlier;
    if (KeptInverse* carried = add(generations_[current_], cells, m, hash)) {
      carried->result = earlier->result;
      carried->errorText = earlier->errorText;
      carried->mean = earlier->mean;
      carried->hasEntrySum = earlier->hasEntrySum;
      carried->entrySum = earlier->entrySum;
      if (earlier->result == 0) {  // a failed inversion left no values
        std::copy(earlier->products, earlier->products + entryFloats(m), carried->products);
      }
      found = carried;
    }
  }
  last_ = found;
  ++reused;
  return found;
}

KeptInverse* InverseCache::keep(const std::int32_t* cells, std::int32_t m, std::int32_t result,
                                const char* reason) {
  Generation& g = generations_[current_];
  const std::uint64_t hash = cellsHash(cells, m);
  KeptInverse* e = add(g, cells, m, hash);
  if (e == nullptr) {
    // The line's room is used up: its inverses so far make way, so that the
    // next nodes can still take this one (those of the line before stay).
    clear(g);
    e = add(g, cells, m, hash);
  }
  last_ = e;
  if (e == nullptr) return nullptr;
  e->result = result;
  e->errorText = reason;
  return e;
}

std::int32_t OBJAN(OaWorkspace& ws, std::int32_t m, float* estimate, const RunSettings& settings,
                   InverseCache* cache) {
  if (m < 1) {
    ws.errorText = "No observational data in OBJAN";
    return -1;
  }
  float mean = 0.0f;
  const float* products = ws.rowProducts;  // row i of the inverse times the values less the mean
  const std::int64_t stride = ws.limit;
  KeptInverse* hit = cache != nullptr ? cache->find(ws.selIndex, m) : nullptr;
  if (hit != nullptr) {
    ws.errorText = hit->errorText;
    if (hit->result != 0) return -1;
    mean = hit->mean;
    for (std::int32_t i = 0; i < m; ++i) ws.selValue[i] = ws.selValue[i] - mean;
    products = hit->products;
    cache->usedEntry = hit;
  } else {
    const std::int32_t inverted = buildCorrelationMatrix(ws, m, settings);
    KeptInverse* kept = nullptr;
    if (cache != nullptr) {
      kept = cache->keep(ws.selIndex, m, inverted, ws.errorText);
      cache->usedEntry = kept;
    }
    if (inverted != 0) return -1;
    float weightSum = 0.0f;
    removeWeightedMean(ws, ws.matrix, ws.selValue, m, mean, weightSum);
    floatRowSums(ws.matrix, ws.limit, ws.selValue, m, m, nullptr, ws.rowProducts);
    if (kept != nullptr) {
      kept->mean = mean;
      std::copy(ws.rowProducts, ws.rowProducts + m, kept->products);
      if (kept->inverse != nullptr) {
        // By column, so that the error variance loads the rows of a column
        // side by side.
        for (std::int32_t i = 0; i < m; ++i) {
          for (std::int32_t j = 0; j < m; ++j) {
            kept->inverse[j * std::int64_t{m} + i] = ws.matrix[i * stride + j];
          }
        }
      }
    }
  }

  float sum = 0.0f;
  for (std::int32_t i = 0; i < m; ++i) sum = ws.selCorr[i] * products[i] + sum;
  *estimate = mean + sum;
  return 0;
}

}  // namespace karnet
