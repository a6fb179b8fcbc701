#ifndef KARNET_SUPPORT_FLOAT_GRID_H_
#define KARNET_SUPPORT_FLOAT_GRID_H_

#include <cstdint>

namespace karnet {

struct FileDescription;

// Dense 2-D array of floats with an index origin; node (j, k) is element
// (k - k0) * nj + (j - j0), x fastest. A copy of the record shares the data;
// the data is released through one copy only.
struct FloatGrid2D {
  std::int32_t j0 = 0;
  std::int32_t k0 = 0;
  std::int32_t nj = 0;
  std::int32_t nk = 0;
  float* data = nullptr;

  std::int64_t elementCount() const { return std::int64_t{nj} * nk; }
  std::int64_t index(std::int32_t j, std::int32_t k) const {
    return std::int64_t{k - k0} * nj + (j - j0);
  }
  float& at(std::int32_t j, std::int32_t k) { return data[index(j, k)]; }
  float at(std::int32_t j, std::int32_t k) const { return data[index(j, k)]; }
};

// Dense 3-D array of floats; node (j, k, l) is element
// ((l - l0) * nk + (k - k0)) * nj + (j - j0), x fastest, z slowest.
// Element counts are 64-bit so that large grids do not overflow.
struct FloatGrid3D {
  std::int32_t j0 = 0;
  std::int32_t k0 = 0;
  std::int32_t l0 = 0;
  std::int32_t nj = 0;
  std::int32_t nk = 0;
  std::int32_t nl = 0;
  std::int32_t unitJ = 1;  // set to 1 by every creator, read by nobody
  std::int32_t unitK = 1;
  std::int32_t unitL = 1;
  std::int64_t total = 0;  // nj * nk * nl
  float* data = nullptr;

  std::int64_t layerSize() const { return std::int64_t{nj} * nk; }
  std::int64_t index(std::int32_t j, std::int32_t k, std::int32_t l) const {
    return (std::int64_t{l - l0} * nk + (k - k0)) * nj + (j - j0);
  }
  float& at(std::int32_t j, std::int32_t k, std::int32_t l) { return data[index(j, k, l)]; }
  float at(std::int32_t j, std::int32_t k, std::int32_t l) const { return data[index(j, k, l)]; }
};

// A 2-D record shaped after the x and y axes of a description (no data).
FloatGrid2D grid2DFromDescription(const FileDescription& description);

// Allocate nj*nk (or total) floats from the checked allocator; contents undefined.
void grid2DAlloc(FloatGrid2D& grid);
void grid3DAlloc(FloatGrid3D& grid);

// Release the data (if any) and clear the pointer.
void grid2DFree(FloatGrid2D& grid);
void grid3DFree(FloatGrid3D& grid);

// Every element of the grid becomes value.
// Sets every value of the grid, on up to `threads` threads.
void grid3DFill(FloatGrid3D& grid, float value, int threads = 1);

// Copies horizontal layer l of a 3-D grid into a 2-D grid of the same x and y
// counts, and back.
void grid3DLayerGet(const FloatGrid3D& grid, std::int32_t l, FloatGrid2D& layer);
void grid3DLayerPut(FloatGrid3D& grid, std::int32_t l, const FloatGrid2D& layer);

// Copies the destination's window (its own origin and counts) out of the source.
void grid2DCopyWindow(FloatGrid2D& destination, const FloatGrid2D& source);

}  // namespace karnet

#endif  // KARNET_SUPPORT_FLOAT_GRID_H_
