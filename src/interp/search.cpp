// Four-quadrant neighbour search on a horizontal layer.
#include "interp/search.h"

#include <algorithm>
#include <cstdint>

#include "interp/node_tests.h"
#include "support/checked_alloc.h"

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

// Number of data nodes in columns jLo..jHi, rows kLo..kHi (inclusive, inside
// the layer, not empty).
std::uint32_t rectangleCount(const SearchIndex& index, std::int64_t jLo, std::int64_t jHi,
                             std::int64_t kLo, std::int64_t kHi) {
  const std::int64_t w = std::int64_t{index.nj} + 1;
  const std::uint32_t* below = index.counts + kLo * w;
  const std::uint32_t* above = index.counts + (kHi + 1) * w;
  return above[jHi + 1] - below[jHi + 1] - above[jLo] + below[jLo];
}

// Number of data nodes of the quadrant within rings 1..r (clipped to the layer).
std::uint32_t quadrantCount(const SearchIndex& index, std::int32_t j, std::int32_t k,
                            const Quadrant& q, std::int64_t r) {
  // Offsets a*u + b*v with a in 1..r and b in 0..r: the images of the corners
  // (1, 0) and (r, r) bound the rectangle.
  const std::int64_t j1 = j + q.uj, k1 = k + q.uk;
  const std::int64_t j2 = j + r * (q.uj + q.vj), k2 = k + r * (q.uk + q.vk);
  const std::int64_t jLo = std::max<std::int64_t>(std::min(j1, j2), 0);
  const std::int64_t jHi = std::min<std::int64_t>(std::max(j1, j2), index.nj - 1);
  const std::int64_t kLo = std::max<std::int64_t>(std::min(k1, k2), 0);
  const std::int64_t kHi = std::min<std::int64_t>(std::max(k1, k2), index.nk - 1);
  if (jLo > jHi || kLo > kHi) return 0;
  return rectangleCount(index, jLo, jHi, kLo, kHi);
}

// First ring 1..rings of the quadrant that holds data, or 0 when none does.
// The search starts at the hint (any value; clamped to 1..rings): a hint that
// is right costs two counts, otherwise the answer is bracketed by galloping
// away from it and then narrowed by halving.
std::int64_t firstDataRing(const SearchIndex& index, std::int32_t j, std::int32_t k,
                           const Quadrant& q, std::int64_t rings, std::int64_t hint) {
  const std::int64_t start = std::clamp<std::int64_t>(hint, 1, rings);
  std::int64_t empty = 0;  // rings 1..empty hold no data
  std::int64_t full = 0;   // rings 1..full hold data
  if (quadrantCount(index, j, k, q, start) != 0) {
    full = start;
    for (std::int64_t step = 1; full - step > 0; step *= 2) {
      if (quadrantCount(index, j, k, q, full - step) == 0) {
        empty = full - step;
        break;
      }
      full -= step;
    }
  } else {
    empty = start;
    for (std::int64_t step = 1; full == 0; step *= 2) {
      if (empty == rings) return 0;
      const std::int64_t probe = std::min(rings, empty + step);
      if (quadrantCount(index, j, k, q, probe) != 0) {
        full = probe;
      } else {
        empty = probe;
      }
    }
  }
  while (full - empty > 1) {
    const std::int64_t mid = empty + (full - empty) / 2;
    if (quadrantCount(index, j, k, q, mid) == 0) {
      empty = mid;
    } else {
      full = mid;
    }
  }
  return full;
}

// Number of data nodes at sj + t*dj, sk + t*dk for t = tFirst .. tLast
// (clipped to the layer).
std::uint32_t legCount(const SearchIndex& index, std::int64_t sj, std::int64_t sk,
                       std::int32_t dj, std::int32_t dk, std::int64_t tFirst, std::int64_t tLast) {
  std::int64_t lo = tFirst;
  std::int64_t hi = tLast;
  clipAxis(sj, dj, index.nj, lo, hi);
  clipAxis(sk, dk, index.nk, lo, hi);
  if (lo > hi) return 0;
  const std::int64_t ja = sj + lo * dj, jb = sj + hi * dj;
  const std::int64_t ka = sk + lo * dk, kb = sk + hi * dk;
  return rectangleCount(index, std::min(ja, jb), std::max(ja, jb), std::min(ka, kb),
                        std::max(ka, kb));
}

// Legs shorter than this are scanned node by node; longer ones are halved
// with leg counts.
constexpr std::int64_t kScannedLegLength = 16;

// As scanLeg, with long legs searched through the count table: the first t
// holding data is found by halving.
std::int64_t findOnLeg(const LayerView& layer, const SearchIndex& index, std::int64_t sj,
                       std::int64_t sk, std::int32_t dj, std::int32_t dk, std::int64_t tFirst,
                       std::int64_t tLast) {
  std::int64_t lo = tFirst;
  std::int64_t hi = tLast;
  clipAxis(sj, dj, layer.nj, lo, hi);
  clipAxis(sk, dk, layer.nk, lo, hi);
  if (hi - lo < kScannedLegLength) return scanLeg(layer, sj, sk, dj, dk, lo, hi);
  if (legCount(index, sj, sk, dj, dk, lo, hi) == 0) return -1;
  while (lo < hi) {  // the first hit lies in lo..hi
    const std::int64_t mid = lo + (hi - lo) / 2;
    if (legCount(index, sj, sk, dj, dk, lo, mid) != 0) {
      hi = mid;
    } else {
      lo = mid + 1;
    }
  }
  return lo;
}

// As scanRing, with long legs searched through the count table.
bool findOnRing(const LayerView& layer, const SearchIndex& index, std::int32_t j, std::int32_t k,
                const Quadrant& q, std::int64_t r, std::int32_t& hj, std::int32_t& hk) {
  return firstOnRing(
      j, k, q, r,
      [&layer, &index](std::int64_t sj, std::int64_t sk, std::int32_t dj, std::int32_t dk,
                       std::int64_t tFirst, std::int64_t tLast) {
        return findOnLeg(layer, index, sj, sk, dj, dk, tFirst, tLast);
      },
      hj, hk);
}

// Tells whether node (hj, hk), in practice the previous search's hit, is the
// quadrant's first data node within rings 1..rings: it must hold data and lie
// in the quadrant on some ring r <= rings, and neither rings 1..r-1 nor the
// part of ring r scanned before it may hold data. If so, stores r in ring.
bool confirmHit(const LayerView& layer, const SearchIndex& index, std::int32_t j,
                std::int32_t k, const Quadrant& q, std::int64_t rings, std::int32_t hj,
                std::int32_t hk, std::int64_t& ring) {
  if (hj < 0 || hj >= layer.nj || hk < 0 || hk >= layer.nk) return false;
  // The node's offset is a*u + b*v; it lies in the quadrant when a >= 1, b >= 0.
  const std::int64_t dj = std::int64_t{hj} - j, dk = std::int64_t{hk} - k;
  const std::int64_t a = dj * q.uj + dk * q.uk;
  const std::int64_t b = dj * q.vj + dk * q.vk;
  if (a < 1 || b < 0) return false;
  const std::int64_t r = std::max(a, b);
  if (r > rings || isEmptyCell(layer.data[hk * layer.nj + hj], layer.deleteValue)) return false;
  if (r > 1 && quadrantCount(index, j, k, q, r - 1) != 0) return false;
  // Leg A: node + r*u + t*v, t = 0 .. r-1 (the node is on it when b < r);
  // leg B: node + t*u + r*v, t = 1 .. r.
  const bool onLegA = b < r;
  if (legCount(index, j + r * q.uj, k + r * q.uk, q.vj, q.vk, 0, onLegA ? b - 1 : r - 1) != 0) {
    return false;
  }
  if (!onLegA && legCount(index, j + r * q.vj, k + r * q.vk, q.uj, q.uk, 1, a - 1) != 0) {
    return false;
  }
  ring = r;
  return true;
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

std::int32_t search(std::int32_t j, std::int32_t k, const FloatGrid2D& layer, float reach,
                    double deleteValue, const SearchIndex& index, SearchHints& hints,
                    std::int32_t* jHit, std::int32_t* kHit) {
  const LayerView view{layer.data, layer.nj, layer.nk, deleteValue};
  std::int32_t edges[4];
  edgeDistances(j, k, layer.nj, layer.nk, edges);
  std::int32_t count = 0;
  for (int quadrant = 0; quadrant < 4; ++quadrant) {
    const std::int64_t rings = ringLimit(edges[quadrant], reach);
    if (rings < 1) continue;
    const Quadrant& q = kQuadrants[quadrant];
    std::int32_t hj = hints.jHit[quadrant], hk = hints.kHit[quadrant];
    std::int64_t ring = 0;
    bool found = confirmHit(view, index, j, k, q, rings, hj, hk, ring);
    if (!found) {
      ring = firstDataRing(index, j, k, q, rings, hints.ring[quadrant]);
      found = ring != 0 && findOnRing(view, index, j, k, q, ring, hj, hk);
    }
    // With no data in reach the limit is kept, so that the next call checks it first.
    hints.ring[quadrant] = static_cast<std::int32_t>(found ? ring : rings);
    if (found) {
      hints.jHit[quadrant] = hj;
      hints.kHit[quadrant] = hk;
      ++count;
      jHit[count] = hj;
      kHit[count] = hk;
    }
  }
  return count;
}

std::int32_t search(std::int32_t j, std::int32_t k, const FloatGrid2D& layer, float reach,
                    double deleteValue, const SearchIndex& index, std::int32_t* jHit,
                    std::int32_t* kHit) {
  SearchHints hints;
  return search(j, k, layer, reach, deleteValue, index, hints, jHit, kHit);
}

void searchIndexAlloc(SearchIndex& index, std::int32_t nj, std::int32_t nk) {
  index.nj = std::max(nj, 0);
  index.nk = std::max(nk, 0);
  index.counts = checkedAllocArray<std::uint32_t>(
      static_cast<std::uint64_t>(index.nj + std::int64_t{1}) *
      static_cast<std::uint64_t>(index.nk + std::int64_t{1}));
}

void searchIndexFree(SearchIndex& index) {
  if (index.counts != nullptr) checkedFree(index.counts);
  index.counts = nullptr;
}

void searchIndexBuild(SearchIndex& index, const FloatGrid2D& layer, double deleteValue) {
  const std::int64_t nj = index.nj;
  const std::int64_t nk = index.nk;
  const std::int64_t w = nj + 1;
  std::uint32_t* c = index.counts;
  std::fill(c, c + w, 0u);
  for (std::int64_t k = 0; k < nk; ++k) {
    const float* row = layer.data + k * nj;
    const std::uint32_t* below = c + k * w;
    std::uint32_t* here = c + (k + 1) * w;
    std::uint32_t rowCount = 0;
    here[0] = 0;
    for (std::int64_t j = 0; j < nj; ++j) {
      rowCount += isEmptyCell(row[j], deleteValue) ? 0u : 1u;
      here[j + 1] = below[j + 1] + rowCount;
    }
  }
}

}  // namespace karnet
