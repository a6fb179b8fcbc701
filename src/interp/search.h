#ifndef KARNET_INTERP_SEARCH_H_
#define KARNET_INTERP_SEARCH_H_

#include <cstdint>
#include <vector>

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

// Distance tables of one layer that answer a search in constant time: for
// each of the four axis directions the distance to the nearest data node
// along it, and for each quadrant the first ring holding data (a quadrant's
// rings 1..r around a node are the node's neighbour diagonally into the
// quadrant with its rings 1..r-1, plus the row and the column the quadrant
// starts with, so one sweep per quadrant fills the table). Distances are held
// in 16 bits where every distance in the layer fits, else in 32.
class SearchTables {
 public:
  SearchTables(std::int32_t nj, std::int32_t nk);
  SearchTables(const SearchTables&) = delete;
  SearchTables& operator=(const SearchTables&) = delete;

  // Fills the tables from layer (nj x nk, as given to the constructor), on
  // up to `threads` threads.
  void build(const FloatGrid2D& layer, double deleteValue, int threads = 1);

  // The search above, for the layer the tables were built from: the same hits.
  std::int32_t search(std::int32_t j, std::int32_t k, float reach, std::int32_t* jHit,
                      std::int32_t* kHit) const;

 private:
  template <typename T>
  struct Distances {
    std::vector<T> along[4];    // +j, -j, +k, -k
    std::vector<T> quadrant[4];  // Q1..Q4
  };
  template <typename T>
  void fill(Distances<T>& d, const FloatGrid2D& layer, double deleteValue, int threads);
  template <typename T>
  std::int32_t find(const Distances<T>& d, std::int32_t j, std::int32_t k, float reach,
                    std::int32_t* jHit, std::int32_t* kHit) const;

  std::int32_t nj_;
  std::int32_t nk_;
  bool wide_;  // 32-bit distances
  Distances<std::uint16_t> narrow16_;
  Distances<std::uint32_t> wide32_;
};

}  // namespace karnet

#endif  // KARNET_INTERP_SEARCH_H_
