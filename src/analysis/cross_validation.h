#ifndef KARNET_ANALYSIS_CROSS_VALIDATION_H_
#define KARNET_ANALYSIS_CROSS_VALIDATION_H_

#include <cstdint>
#include <vector>

#include "params/run_settings.h"
#include "support/float_grid.h"

namespace karnet {

// Differences (analysis - data) gathered at the data nodes of one level, or of
// all levels together.
struct CvStats {
  std::int64_t nodes = 0;   // data nodes compared
  std::int64_t missed = 0;  // data nodes whose left-out estimate failed (nothing within reach)
  double sumDifference = 0.0;
  double sumSquare = 0.0;

  void add(const CvStats& other);
  double rms() const;   // root mean square difference; 0 without nodes
  double bias() const;  // mean difference (analysis - data); 0 without nodes
};

// The outcome of one cross-validation: per local level and overall.
struct CvResult {
  std::int32_t firstLevel = 0;  // local level of levels[0]
  std::vector<CvStats> levels;  // local levels firstLevel, firstLevel + 1, ...
  CvStats overall;
};

// The gridded observations and where the analysis works.
struct CvInput {
  const FloatGrid3D* values = nullptr;      // basic grid after observation gridding
  const FloatGrid3D* bathymetry = nullptr;  // basic bathymetry (landValue at dry nodes)
  double landValue = 0.0;
  double deleteValue = 0.0;
  std::int32_t jOff = 0;  // basic node of the local grid's first node
  std::int32_t kOff = 0;
  std::int32_t lOff = 0;
};

// Casts are the water columns of the basic grid that hold gridded data: all
// observations of one horizontal position fall into one column. A cast is
// validated at its data nodes that lie at wet nodes of the local grid's
// footprint (the nodes the analysis estimates).
//
// For every trial (a full set of settings) and every validated cast, the cast
// is left out and each of its data nodes is estimated as the objective
// analysis estimates it (the same selection, estimator and clipping to
// [MinData, MaxData], without the layer smoothing, which needs the whole
// layer), from the other data cells of its layer only. The difference to the
// gridded value is gathered per level. Only the layers and nodes that hold
// data of a cast are estimated, never a whole layer.
//
// The work is shared among up to `threads` threads, at most 16 (layers and
// trials are independent); the results do not depend on the number of threads.
std::vector<CvResult> crossValidate(const CvInput& input, const std::vector<RunSettings>& trials,
                                    std::int32_t threads);

// Number of casts that crossValidate validates (the settings' grid limits
// decide the footprint).
std::int64_t countValidatedCasts(const CvInput& input, const RunSettings& settings);

}  // namespace karnet

#endif  // KARNET_ANALYSIS_CROSS_VALIDATION_H_
