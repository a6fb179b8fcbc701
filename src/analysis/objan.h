#ifndef KARNET_ANALYSIS_OBJAN_H_
#define KARNET_ANALYSIS_OBJAN_H_

#include <cstdint>
#include <memory>
#include <vector>

#include "analysis/workspace.h"
#include "params/run_settings.h"

namespace karnet {

// What one inversion left for later nodes that choose the same cells in the
// same order: those have the very same matrix, and so the same inverse, and
// (the same cells having the same values) the same weighted mean and row
// products.
struct KeptInverse {
  std::int32_t count = 0;          // cells
  std::int32_t result = 0;         // what the inversion gave (0 or -1)
  const char* errorText = "";      // and the reason it left
  std::uint64_t hash = 0;          // of the ordered cell list
  float mean = 0.0f;               // weighted mean of the values (success only)
  std::int32_t* cells = nullptr;   // count indices
  float* products = nullptr;       // count row products with the values less the mean
  float* inverse = nullptr;        // count x count by column ((i, j) at j * count + i)
  bool hasEntrySum = false;        // entrySum made (by the first error variance)
  double entrySum = 0.0;           // the inverse's entry sum (inverseEntrySum)
};

// The inverses one thread made on the line of nodes it is walking and on the
// line before: neighbouring nodes of the two lines mostly choose the same
// cells. Entries of older lines are dropped as a new line starts; an entry
// that the new line uses again is carried over. A line has room for a few
// MiB of inverses; when that is used up, the line's entries so far are
// dropped.
class InverseCache {
 public:
  // limit: the most cells of an estimate; lineNodes: the nodes of a line;
  // keepMatrices: each inverse is kept too (for the error variances).
  InverseCache(std::int32_t limit, std::int64_t lineNodes, bool keepMatrices);
  InverseCache(const InverseCache&) = delete;
  InverseCache& operator=(const InverseCache&) = delete;

  // The next line begins: entries made before the line just ended go.
  void startLine();
  // The kept inverse of exactly these cells in this order, or null.
  KeptInverse* find(const std::int32_t* cells, std::int32_t m);
  // Room for the inverse of these cells (cells, count, result and reason set;
  // the caller fills mean, products and inverse), or null when there is none.
  KeptInverse* keep(const std::int32_t* cells, std::int32_t m, std::int32_t result,
                    const char* reason);
  // The kept inverse of the last estimate; null when it was not kept (its
  // inverse is then in the workspace's matrix).
  KeptInverse* usedEntry = nullptr;
  std::int64_t reused = 0;  // estimates that took a kept inverse

 private:
  struct Generation {
    std::vector<KeptInverse> entries;
    std::unique_ptr<std::int32_t[]> cells;
    std::unique_ptr<float[]> values;
    std::size_t cellsUsed = 0;
    std::size_t valuesUsed = 0;
    std::vector<std::uint32_t> slots;  // entry index + 1, 0 when free
  };
  static void clear(Generation& g);
  KeptInverse* add(Generation& g, const std::int32_t* cells, std::int32_t m,
                   std::uint64_t hash);
  KeptInverse* lookUp(Generation& g, const std::int32_t* cells, std::int32_t m,
                      std::uint64_t hash);

  // Values an entry of m cells takes: its row products and, when kept, its
  // inverse.
  std::size_t entryFloats(std::int32_t m) const;

  bool keepMatrices_;
  std::size_t maxEntries_;
  std::size_t cellsRoom_;   // per generation
  std::size_t valuesRoom_;  // per generation
  KeptInverse* last_ = nullptr;
  Generation generations_[2];
  int current_ = 0;
};

// Optimal-interpolation estimate from the m cells chosen by selectData
// (ws.selX, selY, selValue, selCorr): mu + rho' A^-1 (d - mu), where A is the
// cells' correlation matrix with the error term on its diagonal and mu the
// A^-1-weighted mean of the values d. Returns 0 and writes *estimate on
// success; returns -1 and leaves *estimate alone on failure, with ws.errorText
// naming the reason. ws.selValue is left with the mean removed.
// With a cache, the matrix is not built and inverted again when the chosen
// cells (ws.selIndex[0..m-1]) are those of a kept inverse: the mean and row
// products are the kept ones, and the estimate is the same bit for bit.
// cache->usedEntry tells which kept inverse the estimate used.
std::int32_t OBJAN(OaWorkspace& ws, std::int32_t m, float* estimate, const RunSettings& settings,
                   InverseCache* cache = nullptr);

// Fills the top-left m x m block of ws.matrix with the correlations among the
// chosen cells, adds ErrorVariance / 100 on the diagonal and inverts the block
// in place with INVMTX. Returns 0, or -1 when the inversion fails.
std::int32_t buildCorrelationMatrix(OaWorkspace& ws, std::int32_t m, const RunSettings& settings);

// The filling step of buildCorrelationMatrix alone (m <= ws.limit). With
// vectorised, the processor's vector body where it has one; both give the
// same bits.
void fillCorrelationMatrix(OaWorkspace& ws, std::int32_t m, const RunSettings& settings,
                           bool vectorised = true);

// With a the inverted matrix (row stride ws.limit): mean = (sum of a's
// row products with values) / (sum of all of a's n x n entries); subtracts the
// mean from values[0..n-1] in place and hands back the mean and the entry sum.
// Uses ws.rowSums and ws.rowProducts.
void removeWeightedMean(const OaWorkspace& ws, const float* a, float* values, std::int32_t n,
                        float& mean, float& weightSum);

}  // namespace karnet

#endif  // KARNET_ANALYSIS_OBJAN_H_
