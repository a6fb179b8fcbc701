#ifndef KARNET_INTERP_SEARCH_H_
#define KARNET_INTERP_SEARCH_H_

#include <cstdint>

#include "params/run_settings.h"
#include "support/float_grid.h"

namespace karnet {

// Hit lists are indexed from 1: entries 1..4 are used, entry 0 is never touched.
inline constexpr int kHitListSize = 5;

// Reach of the neighbour search in nodes: SearchRadius / dx in single precision,
// used for both directions.
float searchReach(const RunSettings& settings);

// Looks around node (j, k) of layer for the first data node of each quadrant,
// walking outward ring by ring up to the reach (or the farther grid edge the
// quadrant faces, whichever is smaller):
//   Q1: dj > 0, dk >= 0   Q2: dj <= 0, dk > 0   Q3: dj < 0, dk <= 0   Q4: dj >= 0, dk < 0
// Hits are stored in quadrant order in jHit[1..n], kHit[1..n]; returns n (0..4).
// The layer's nodes are 0..nj-1, 0..nk-1 at data offset k * nj + j (the work
// layers have origin (0, 0)). A node holds data when it differs from deleteValue.
std::int32_t search(std::int32_t j, std::int32_t k, const FloatGrid2D& layer, float reach,
                    double deleteValue, std::int32_t* jHit, std::int32_t* kHit);

// Count table of the data nodes of one layer, so that a search can tell in
// constant time whether a quadrant holds data within r rings and skip the
// empty rings. counts has (nj + 1) * (nk + 1) entries: entry (k, j) at
// k * (nj + 1) + j is the number of data nodes in columns 0..j-1, rows 0..k-1.
// The caller owns the storage (searchIndexAlloc / searchIndexFree) and rebuilds
// the table whenever the layer changes.
struct SearchIndex {
  std::int32_t nj = 0;
  std::int32_t nk = 0;
  std::uint32_t* counts = nullptr;
};

// Storage for a table of an nj x nk layer, from the checked allocator.
void searchIndexAlloc(SearchIndex& index, std::int32_t nj, std::int32_t nk);
void searchIndexFree(SearchIndex& index);
// Fills the table from layer (whose counts must equal the index's).
void searchIndexBuild(SearchIndex& index, const FloatGrid2D& layer, double deleteValue);

// What earlier searches over a layer found, per quadrant: the last hit and the
// last first data ring (or the ring limit, when no data was in reach).
// Neighbouring nodes mostly share their hits, so a search first checks the last
// hit exactly against the count table, and failing that looks for the first
// data ring outward or inward from the last one. Any content gives the same
// hits, only the cost differs. The caller keeps one per walk over a layer.
struct SearchHints {
  std::int32_t jHit[4] = {-1, -1, -1, -1};
  std::int32_t kHit[4] = {-1, -1, -1, -1};
  std::int32_t ring[4] = {1, 1, 1, 1};
};

// The same search, with the hits found through the count table of the layer.
// Gives exactly the hits of the plain search, reading far fewer nodes when the
// data lie far away. Starts from the hints and updates them.
std::int32_t search(std::int32_t j, std::int32_t k, const FloatGrid2D& layer, float reach,
                    double deleteValue, const SearchIndex& index, SearchHints& hints,
                    std::int32_t* jHit, std::int32_t* kHit);

// The same with fresh hints, for a single search.
std::int32_t search(std::int32_t j, std::int32_t k, const FloatGrid2D& layer, float reach,
                    double deleteValue, const SearchIndex& index, std::int32_t* jHit,
                    std::int32_t* kHit);

}  // namespace karnet

#endif  // KARNET_INTERP_SEARCH_H_
