// Four-quadrant neighbour search on a horizontal layer.
#include "interp/search.h"

#include <algorithm>
#include <cstdint>
#include <limits>

#include "interp/node_tests.h"

namespace karnet {

namespace {

// A quadrant seen from the node: u points along its first leg's ring side,
// v is u turned a quarter counterclockwise. Ring r of the quadrant is
//   leg A: node + r*u + t*v, t = 0 .. r-1,   leg B: node + t*u + r*v, t = 1 .. r,
// and the rings 1..r together cover the offsets a*u + b*v, a in 1..r, b in 0..r.
struct Quadrant {
  std::int32_t uj, uk;
  std::int32_t vj, vk;
};

constexpr Quadrant kQuadrants[4] = {
    {1, 0, 0, 1},    // Q1: dj > 0, dk >= 0
    {0, 1, -1, 0},   // Q2: dj <= 0, dk > 0
    {-1, 0, 0, -1},  // Q3: dj < 0, dk <= 0
    {0, -1, 1, 0},   // Q4: dj >= 0, dk < 0
};

// The layer as the search sees it.
struct LayerView {
  const float* data;
  std::int64_t nj;
  std::int64_t nk;
  double deleteValue;
};

// Ring limit of a quadrant: the farther of the two edges it faces, cut to the
// reach when the reach is not greater; below one ring nothing is searched.
std::int32_t ringLimit(std::int32_t edgeDistance, float reach) {
  float limit = static_cast<float>(edgeDistance);
  if (reach <= limit) limit = reach;
  // limit is at most the edge distance here (or NaN), so the conversion is safe.
  if (!(limit >= 1.0f)) return 0;
  return static_cast<std::int32_t>(limit);
}

// Narrows [lo, hi] to the t for which c + t*step lies in 0 .. n-1.
void clipAxis(std::int64_t c, std::int32_t step, std::int64_t n, std::int64_t& lo,
              std::int64_t& hi) {
  if (step == 0) {
    if (c < 0 || c > n - 1) hi = lo - 1;
  } else if (step > 0) {
    lo = std::max(lo, -c);
    hi = std::min(hi, n - 1 - c);
  } else {
    lo = std::max(lo, c - (n - 1));
    hi = std::min(hi, c);
  }
}

// Walks the candidates (sj + t*dj, sk + t*dk) for t = tFirst .. tLast in order,
// passing over those outside the layer without reading them. Returns the first
// t whose node holds data, or -1.
std::int64_t scanLeg(const LayerView& layer, std::int64_t sj, std::int64_t sk, std::int32_t dj,
                     std::int32_t dk, std::int64_t tFirst, std::int64_t tLast) {
  std::int64_t lo = tFirst;
  std::int64_t hi = tLast;
  clipAxis(sj, dj, layer.nj, lo, hi);
  clipAxis(sk, dk, layer.nk, lo, hi);
  if (lo > hi) return -1;
  const std::int64_t stride = std::int64_t{dk} * layer.nj + dj;
  const float* p = layer.data + (sk + lo * dk) * layer.nj + (sj + lo * dj);
  for (std::int64_t t = lo; t <= hi; ++t, p += stride) {
    if (!isEmptyCell(*p, layer.deleteValue)) return t;
  }
  return -1;
}

// Walks the quadrant's part of ring r, leg A before leg B; findLeg(sj, sk, dj, dk,
// tFirst, tLast) gives the first t of a leg whose node holds data, or -1. On a hit
// stores the node in (hj, hk) and returns true.
template <typename LegFinder>
bool firstOnRing(std::int32_t j, std::int32_t k, const Quadrant& q, std::int64_t r,
                 const LegFinder& findLeg, std::int32_t& hj, std::int32_t& hk) {
  // Leg A: node + r*u + t*v, t = 0 .. r-1.
  std::int64_t sj = j + r * q.uj;
  std::int64_t sk = k + r * q.uk;
  std::int64_t t = findLeg(sj, sk, q.vj, q.vk, 0, r - 1);
  if (t >= 0) {
    hj = static_cast<std::int32_t>(sj + t * q.vj);
    hk = static_cast<std::int32_t>(sk + t * q.vk);
    return true;
  }
  // Leg B: node + t*u + r*v, t = 1 .. r.
  sj = j + r * q.vj;
  sk = k + r * q.vk;
  t = findLeg(sj, sk, q.uj, q.uk, 1, r);
  if (t >= 0) {
    hj = static_cast<std::int32_t>(sj + t * q.uj);
    hk = static_cast<std::int32_t>(sk + t * q.uk);
    return true;
  }
  return false;
}

// Scans the quadrant's part of ring r node by node.
bool scanRing(const LayerView& layer, std::int32_t j, std::int32_t k, const Quadrant& q,
              std::int64_t r, std::int32_t& hj, std::int32_t& hk) {
  return firstOnRing(
      j, k, q, r,
      [&layer](std::int64_t sj, std::int64_t sk, std::int32_t dj, std::int32_t dk,
               std::int64_t tFirst, std::int64_t tLast) {
        return scanLeg(layer, sj, sk, dj, dk, tFirst, tLast);
      },
      hj, hk);
}

// Farther of the two grid edges each quadrant faces, in quadrant order.
void edgeDistances(std::int32_t j, std::int32_t k, std::int32_t nj, std::int32_t nk,
                   std::int32_t edges[4]) {
  edges[0] = std::max(nj - 1 - j, nk - 1 - k);
  edges[1] = std::max(nk - 1 - k, j);
  edges[2] = std::max(k, j);
  edges[3] = std::max(k, nj - 1 - j);
}

}  // namespace

float searchReach(const RunSettings& settings) { return settings.SearchRadius / settings.dx; }

std::int32_t search(std::int32_t j, std::int32_t k, const FloatGrid2D& layer, float reach,
                    double deleteValue, std::int32_t* jHit, std::int32_t* kHit) {
  const LayerView view{layer.data, layer.nj, layer.nk, deleteValue};
  std::int32_t edges[4];
  edgeDistances(j, k, layer.nj, layer.nk, edges);
  std::int32_t count = 0;
  for (int quadrant = 0; quadrant < 4; ++quadrant) {
    const std::int32_t rings = ringLimit(edges[quadrant], reach);
    for (std::int64_t r = 1; r <= rings; ++r) {
      std::int32_t hj = 0, hk = 0;
      if (scanRing(view, j, k, kQuadrants[quadrant], r, hj, hk)) {
        ++count;
        jHit[count] = hj;
        kHit[count] = hk;
        break;
      }
    }
  }
  return count;
}

namespace {

// Axis directions of the distance tables, and the two each quadrant's rings
// run along (u, v as in kQuadrants).
constexpr std::int32_t kDirJ[4] = {1, -1, 0, 0};
constexpr std::int32_t kDirK[4] = {0, 0, 1, -1};
constexpr int kUDir[4] = {0, 2, 1, 3};
constexpr int kVDir[4] = {2, 1, 3, 0};

// Largest grid side whose distances fit 16 bits (the largest value marks "none").
constexpr std::int32_t kNarrowSide = 65535;

}  // namespace

SearchTables::SearchTables(std::int32_t nj, std::int32_t nk)
    : nj_(std::max(nj, 0)), nk_(std::max(nk, 0)), wide_(std::max(nj, nk) > kNarrowSide) {
  const std::size_t size = static_cast<std::size_t>(nj_) * static_cast<std::size_t>(nk_);
  for (int i = 0; i < 4; ++i) {
    if (wide_) {
      wide32_.along[i].resize(size);
      wide32_.quadrant[i].resize(size);
    } else {
      narrow16_.along[i].resize(size);
      narrow16_.quadrant[i].resize(size);
    }
  }
}

void SearchTables::build(const FloatGrid2D& layer, double deleteValue, int threads) {
  if (layer.nj != nj_ || layer.nk != nk_) return;
  if (wide_) {
    fill(wide32_, layer, deleteValue, threads);
  } else {
    fill(narrow16_, layer, deleteValue, threads);
  }
}

namespace {

// One node further than x; "none" stays "none".
template <typename T>
inline T oneFurther(T x) {
  return static_cast<T>(x + static_cast<T>(x != std::numeric_limits<T>::max()));
}

// row[j] = source[j + shift] where that lies in 0..n-1, else "none".
template <typename T>
void takeShifted(T* row, const T* source, std::int64_t shift, std::int64_t n) {
  constexpr T kNone = std::numeric_limits<T>::max();
  if (source == nullptr) {
    std::fill(row, row + n, kNone);
  } else if (shift == 0) {
    std::copy(source, source + n, row);
  } else if (shift > 0) {
    for (std::int64_t j = 0; j + 1 < n; ++j) row[j] = source[j + 1];
    if (n > 0) row[n - 1] = kNone;
  } else {
    for (std::int64_t j = 1; j < n; ++j) row[j] = source[j - 1];
    if (n > 0) row[0] = kNone;
  }
}

// row[j] = min(row[j], a[j + shift], b[j + shift]) where j + shift lies in 0..n-1.
template <typename T>
void lowerShifted(T* row, const T* a, const T* b, std::int64_t shift, std::int64_t n) {
  const std::int64_t first = shift < 0 ? 1 : 0;
  const std::int64_t last = shift > 0 ? n - 2 : n - 1;
  for (std::int64_t j = first; j <= last; ++j) {
    row[j] = std::min(row[j], std::min(a[j + shift], b[j + shift]));
  }
}

}  // namespace

template <typename T>
void SearchTables::fill(Distances<T>& d, const FloatGrid2D& layer, double deleteValue,
                        int threads) {
  constexpr T kNone = std::numeric_limits<T>::max();
  const std::int64_t nj = nj_, nk = nk_;
  const float* data = layer.data;
  // A cell is empty when its value widened equals the delete value; that can
  // only be when the delete value is a float, and then the float comparison
  // gives the same answer.
  const float hole = static_cast<float>(deleteValue);
  const bool holes = static_cast<double>(hole) == deleteValue;
  auto holds = [hole, holes](float v) { return !(holes && v == hole); };
  // Distances never reach "none": they are below the grid's larger side.
  auto alongAxis = [&](int dir) {
    T* out = d.along[dir].data();
    if (kDirK[dir] == 0) {
      const bool rightward = kDirJ[dir] > 0;
      for (std::int64_t k = 0; k < nk; ++k) {
        const float* values = data + k * nj;
        T* row = out + k * nj;
        T next = kNone;
        for (std::int64_t i = 0; i < nj; ++i) {
          const std::int64_t j = rightward ? nj - 1 - i : i;
          next = holds(values[j]) ? T{0} : oneFurther(next);
          row[j] = next;
        }
      }
    } else {
      const bool upward = kDirK[dir] > 0;
      for (std::int64_t i = 0; i < nk; ++i) {
        const std::int64_t k = upward ? nk - 1 - i : i;
        const std::int64_t before = upward ? k + 1 : k - 1;  // the row already done
        const float* values = data + k * nj;
        T* row = out + k * nj;
        if (before < 0 || before >= nk) {
          for (std::int64_t j = 0; j < nj; ++j) row[j] = holds(values[j]) ? T{0} : kNone;
        } else {
          const T* previous = out + before * nj;
          for (std::int64_t j = 0; j < nj; ++j) {
            row[j] = holds(values[j]) ? T{0} : oneFurther(previous[j]);
          }
        }
      }
    }
  };
  // First data ring of quadrant q at every node, row by row: one further than
  // the least of the first data along u from the neighbour at u, the first
  // data along v from the diagonal neighbour (at u + v) and the diagonal
  // neighbour's own first ring. The diagonal neighbours lie in the row before.
  auto quadrantRings = [&](int q) {
    const Quadrant& quad = kQuadrants[q];
    const T* alongU = d.along[kUDir[q]].data();
    const T* alongV = d.along[kVDir[q]].data();
    T* out = d.quadrant[q].data();
    const std::int32_t wj = quad.uj + quad.vj, wk = quad.uk + quad.vk;
    for (std::int64_t ik = 0; ik < nk; ++ik) {
      const std::int64_t k = wk > 0 ? nk - 1 - ik : ik;
      const std::int64_t before = k + wk;
      const bool hasBefore = before >= 0 && before < nk;
      T* row = out + k * nj;
      if (quad.uk == 0) {
        takeShifted(row, alongU + k * nj, quad.uj, nj);
      } else {
        takeShifted(row, hasBefore ? alongU + before * nj : nullptr, 0, nj);
      }
      if (hasBefore) lowerShifted(row, alongV + before * nj, out + before * nj, wj, nj);
      for (std::int64_t j = 0; j < nj; ++j) row[j] = oneFurther(row[j]);
    }
  };
#pragma omp parallel num_threads(threads) if (threads > 1)
  {
#pragma omp for schedule(static, 1)
    for (int dir = 0; dir < 4; ++dir) alongAxis(dir);
#pragma omp for schedule(static, 1)
    for (int q = 0; q < 4; ++q) quadrantRings(q);
  }
}

std::int32_t SearchTables::search(std::int32_t j, std::int32_t k, float reach,
                                  std::int32_t* jHit, std::int32_t* kHit) const {
  return wide_ ? find(wide32_, j, k, reach, jHit, kHit) : find(narrow16_, j, k, reach, jHit, kHit);
}

template <typename T>
std::int32_t SearchTables::find(const Distances<T>& d, std::int32_t j, std::int32_t k,
                                float reach, std::int32_t* jHit, std::int32_t* kHit) const {
  constexpr T kNone = std::numeric_limits<T>::max();
  const std::int64_t nj = nj_, nk = nk_;
  const std::int64_t node = std::int64_t{k} * nj + j;
  std::int32_t edges[4];
  edgeDistances(j, k, nj_, nk_, edges);
  std::int32_t count = 0;
  for (int q = 0; q < 4; ++q) {
    const std::int32_t rings = ringLimit(edges[q], reach);
    const T ring = d.quadrant[q][static_cast<std::size_t>(node)];
    if (rings < 1 || ring == kNone || std::int64_t{ring} > rings) continue;
    const Quadrant& quad = kQuadrants[q];
    const std::int64_t r = ring;
    // Leg A of the ring: node + r*u + t*v, t = 0 .. r-1.
    std::int64_t hj = j + r * quad.uj, hk = k + r * quad.uk;
    bool found = false;
    if (hj >= 0 && hj < nj && hk >= 0 && hk < nk) {
      const T t = d.along[kVDir[q]][static_cast<std::size_t>(hk * nj + hj)];
      if (t != kNone && t < r) {
        hj += t * quad.vj;
        hk += t * quad.vk;
        found = true;
      }
    }
    // Leg B: node + t*u + r*v, t = 1 .. r; the ring's data is there.
    if (!found) {
      hj = j + quad.uj + r * quad.vj;
      hk = k + quad.uk + r * quad.vk;
      if (hj >= 0 && hj < nj && hk >= 0 && hk < nk) {
        const T t = d.along[kUDir[q]][static_cast<std::size_t>(hk * nj + hj)];
        if (t != kNone && t < r) {
          hj += t * quad.uj;
          hk += t * quad.uk;
          found = true;
        }
      }
    }
    if (!found) continue;  // tables that do not match the layer find nothing
    ++count;
    jHit[count] = static_cast<std::int32_t>(hj);
    kHit[count] = static_cast<std::int32_t>(hk);
  }
  return count;
}

}  // namespace karnet
