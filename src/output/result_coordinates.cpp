// The georeferenced coordinates of a result grid: depths below the surface,
// projected (or grid-axis) x and y, and every node's longitude and latitude
// from PROJ's inverse of its projected position.
#include "output/result_coordinates.h"

#include <cmath>
#include <limits>
#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "input/cartography.h"
#include "support/file_description.h"

namespace karnet {
namespace {

// Cartographies of one projection for threads that transform side by side.
class CartographyPool {
 public:
  CartographyPool(std::string projection, double longitude, double latitude, double orientation,
                  std::shared_ptr<Cartography> first)
      : projection_(std::move(projection)),
        longitude_(longitude),
        latitude_(latitude),
        orientation_(orientation) {
    idle_.push_back(std::move(first));
  }

  // One cartography, the caller's alone until the lease ends.
  class Lease {
   public:
    explicit Lease(CartographyPool& pool) : pool_(pool), map_(pool.take()) {}
    ~Lease() { pool_.give(std::move(map_)); }
    Lease(const Lease&) = delete;
    Lease& operator=(const Lease&) = delete;
    const Cartography& map() const { return *map_; }

   private:
    CartographyPool& pool_;
    std::shared_ptr<Cartography> map_;
  };

 private:
  std::shared_ptr<Cartography> take() {
    {
      const std::lock_guard<std::mutex> lock(mutex_);
      if (!idle_.empty()) {
        std::shared_ptr<Cartography> map = std::move(idle_.back());
        idle_.pop_back();
        return map;
      }
    }
    return std::make_shared<Cartography>(projection_, longitude_, latitude_, orientation_);
  }
  void give(std::shared_ptr<Cartography> map) {
    const std::lock_guard<std::mutex> lock(mutex_);
    idle_.push_back(std::move(map));
  }

  const std::string projection_;
  const double longitude_, latitude_, orientation_;
  std::mutex mutex_;
  std::vector<std::shared_ptr<Cartography>> idle_;
};

bool makeFrame(const FileDescription& d, const Cartography& map, bool local, ResultFrame* f) {
  const double longitude = d.axes[1].origin;
  const double latitude = d.axes[2].origin;
  const double orientation = d.misc[0];
  f->local = local;
  map.geoToProj(longitude, latitude, &f->xOrigin, &f->yOrigin);
  if (!std::isfinite(f->xOrigin) || !std::isfinite(f->yOrigin)) return false;
  // The origin's longitude and latitude are those data scanning takes the
  // convergence at (the description holds the inverse of the projected origin).
  const double gamma = map.convergence(longitude, latitude);
  if (!std::isfinite(gamma)) return false;
  const double tolerance =
      kParallelGridTolerance + std::fabs(orientation) * std::numeric_limits<float>::epsilon();
  f->turned = !(std::fabs(orientation - gamma) <= tolerance);
  if (f->turned) {
    const double theta = (orientation - gamma) * (-3.141592654) / 180;
    f->co = std::cos(theta);
    f->si = std::sin(theta);
  }
  return true;
}

}  // namespace

bool resultGeoreference(const FileDescription& d, const std::string& projection,
                        GrdGeoreference* g, ResultFrame* frameOut) {
  std::shared_ptr<Cartography> map;
  try {
    map = std::make_shared<Cartography>(projection, d.axes[1].origin, d.axes[2].origin,
                                        d.misc[0]);
  } catch (...) {
    return false;
  }
  const bool local = map->wkt().empty();
  ResultFrame frame;
  if (!makeFrame(d, *map, local, &frame)) return false;
  if (frameOut != nullptr) *frameOut = frame;

  const double dx = static_cast<double>(d.axes[1].spacing);
  const double dy = static_cast<double>(d.axes[2].spacing);
  const double dz = static_cast<double>(d.axes[3].spacing);
  // Level l0 lies (lx - l0 + 1) spacings below the surface.
  g->firstDepth = static_cast<double>(d.axes[3].lastIndex + 1) * dz;
  g->projectedXY = !frame.turned;
  g->xFirst = frame.turned ? 0.0 : frame.xOrigin;
  g->yFirst = frame.turned ? 0.0 : frame.yOrigin;
  // A turned grid must not be placed through x and y; plain metres have
  // nothing else to place it by.
  g->itemGridMapping = local || !frame.turned;
  g->rowGeolocation = nullptr;
  if (local) return true;

  const std::size_t nx = static_cast<std::size_t>(d.axes[1].lastIndex) + 1;
  // PROJ objects serve one thread at a time: rows made side by side take
  // their own from a pool that grows to the number of threads at work.
  auto pool = std::make_shared<CartographyPool>(projection, d.axes[1].origin, d.axes[2].origin,
                                                d.misc[0], std::move(map));
  g->rowGeolocation = [pool, frame, dx, dy, nx](std::int32_t row, double* lon, double* lat) {
    for (std::size_t i = 0; i < nx; ++i) {
      frame.nodePosition(dx, dy, static_cast<double>(i), static_cast<double>(row), &lon[i],
                         &lat[i]);
    }
    CartographyPool::Lease lease(*pool);
    lease.map().projToGeo(nx, lon, lat);
    return true;
  };
  return true;
}

}  // namespace karnet
