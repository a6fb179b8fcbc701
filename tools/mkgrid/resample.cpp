// Bringing the source's values onto the grid: cell copies or GDAL's warper.
#include "mkgrid/resample.h"

#include <cpl_conv.h>
#include <cpl_error.h>
#include <cpl_string.h>
#include <gdalwarper.h>
#include <unistd.h>

#include <cmath>
#include <cstdio>
#include <limits>
#include <new>

namespace karnet::mkgrid {
namespace {

constexpr double kNoValue = std::numeric_limits<double>::quiet_NaN();

bool copyCells(const SourceRaster& source, const TargetGrid& grid, std::vector<double>* values,
               std::string* error) {
  const std::int64_t nx = grid.nx;
  for (std::int64_t j = 0; j < grid.ny; ++j) {
    const std::int64_t rowUp = grid.firstRowUp + j;
    if (rowUp < 0 || rowUp >= source.height) continue;
    const std::int64_t first = std::max<std::int64_t>(0, grid.firstColumn);
    const std::int64_t last = std::min<std::int64_t>(source.width, grid.firstColumn + nx);
    if (first >= last) continue;
    double* row = values->data() + j * nx + (first - grid.firstColumn);
    const int line = static_cast<int>(source.height - 1 - rowUp);  // GDAL's lines run south
    CPLErrorReset();
    if (GDALRasterIO(source.band, GF_Read, static_cast<int>(first), line,
                     static_cast<int>(last - first), 1, row, static_cast<int>(last - first), 1,
                     GDT_Float64, 0, 0) != CE_None) {
      *error = "reading the source: " + lastGdalError("read error");
      return false;
    }
    for (std::int64_t i = 0; i < last - first; ++i) {
      if (source.hasNodata && row[i] == source.nodata) row[i] = kNoValue;
    }
  }
  return true;
}

GDALResampleAlg gdalMethod(Resampling method) {
  switch (method) {
    case Resampling::Average:
      return GRA_Average;
    case Resampling::Nearest:
      return GRA_NearestNeighbour;
    case Resampling::Cubic:
      return GRA_Cubic;
    default:
      return GRA_Bilinear;
  }
}

// Warps into values, the rows north first.
bool warp(const SourceRaster& source, const TargetGrid& grid, std::vector<double>* values,
          std::string* error) {
  GDALDriverH memory = GDALGetDriverByName("MEM");
  Dataset target(memory == nullptr
                     ? nullptr
                     : GDALCreate(memory, "", grid.nx, grid.ny, 0, GDT_Float64, nullptr));
  char pointer[64];
  std::snprintf(pointer, sizeof pointer, "DATAPOINTER=%p", static_cast<void*>(values->data()));
  char** bandOptions = CSLAddString(nullptr, pointer);
  const bool added = target && GDALAddBand(target.get(), GDT_Float64, bandOptions) == CE_None;
  CSLDestroy(bandOptions);
  if (!added) {
    *error = "cannot set up the grid for GDAL: " + lastGdalError("MEM driver missing");
    return false;
  }
  double transform[6];
  grid.geoTransform(transform);
  GDALSetGeoTransform(target.get(), transform);
  GDALRasterBandH band = GDALGetRasterBand(target.get(), 1);
  GDALSetRasterNoDataValue(band, kNoValue);

  char** transformOptions = nullptr;
  if (!grid.sourceWkt.empty()) {
    transformOptions = CSLSetNameValue(transformOptions, "SRC_SRS", grid.sourceWkt.c_str());
    transformOptions = CSLSetNameValue(transformOptions, "DST_SRS", grid.targetWkt.c_str());
  }
  CPLErrorReset();
  void* transformer =
      GDALCreateGenImgProjTransformer2(source.dataset.get(), target.get(), transformOptions);
  CSLDestroy(transformOptions);
  if (transformer == nullptr) {
    *error = "cannot relate the source to the grid: " + lastGdalError("no transformer");
    return false;
  }
  GDALWarpOptions* warpOptions = GDALCreateWarpOptions();
  warpOptions->hSrcDS = source.dataset.get();
  warpOptions->hDstDS = target.get();
  warpOptions->nBandCount = 1;
  warpOptions->panSrcBands = static_cast<int*>(CPLMalloc(sizeof(int)));
  warpOptions->panSrcBands[0] = GDALGetBandNumber(source.band);
  warpOptions->panDstBands = static_cast<int*>(CPLMalloc(sizeof(int)));
  warpOptions->panDstBands[0] = 1;
  warpOptions->eResampleAlg = gdalMethod(grid.method);
  warpOptions->eWorkingDataType = GDT_Float64;
  if (source.hasNodata) {
    warpOptions->padfSrcNoDataReal = static_cast<double*>(CPLMalloc(sizeof(double)));
    warpOptions->padfSrcNoDataReal[0] = source.nodata;
  }
  warpOptions->padfDstNoDataReal = static_cast<double*>(CPLMalloc(sizeof(double)));
  warpOptions->padfDstNoDataReal[0] = kNoValue;
  warpOptions->papszWarpOptions =
      CSLSetNameValue(warpOptions->papszWarpOptions, "INIT_DEST", "NO_DATA");
  warpOptions->pfnTransformer = GDALGenImgProjTransform;
  warpOptions->pTransformerArg = transformer;

  GDALWarpOperationH operation = GDALCreateWarpOperation(warpOptions);
  const bool warped =
      operation != nullptr && GDALChunkAndWarpImage(operation, 0, 0, grid.nx, grid.ny) == CE_None;
  if (!warped) *error = "resampling failed: " + lastGdalError("GDAL's warper gave up");
  if (operation != nullptr) GDALDestroyWarpOperation(operation);
  GDALDestroyGenImgProjTransformer(transformer);
  GDALDestroyWarpOptions(warpOptions);
  if (warped) GDALFlushCache(target.get());
  return warped;
}

}  // namespace

bool resampleSource(const SourceRaster& source, const TargetGrid& grid, std::vector<double>* values,
                    std::string* error) {
  const std::size_t nx = static_cast<std::size_t>(grid.nx);
  const std::size_t ny = static_cast<std::size_t>(grid.ny);
  // Asking for more than the machine holds would end in the kernel's
  // out-of-memory killer rather than a failed allocation.
  const double bytes = static_cast<double>(nx) * static_cast<double>(ny) * 12.0;
  const double memory =
      static_cast<double>(sysconf(_SC_PHYS_PAGES)) * static_cast<double>(sysconf(_SC_PAGESIZE));
  if (memory > 0.0 && bytes > memory) {
    *error = std::to_string(nx) + " x " + std::to_string(ny) + " nodes need " +
             std::to_string(static_cast<long long>(bytes / 1073741824.0 + 1.0)) +
             " GiB, more than this machine's memory; give a larger --spacing or a smaller extent";
    return false;
  }
  try {
    values->assign(nx * ny, kNoValue);
  } catch (const std::bad_alloc&) {
    *error = "not enough memory for " + std::to_string(nx) + " x " + std::to_string(ny) + " nodes";
    return false;
  }
  if (grid.copyCells) return copyCells(source, grid, values, error);
  if (!warp(source, grid, values, error)) return false;
  // GDAL's first line is the northernmost row; the grid's first row is the southernmost.
  for (std::size_t j = 0; j < ny / 2; ++j) {
    std::swap_ranges(values->begin() + j * nx, values->begin() + (j + 1) * nx,
                     values->begin() + (ny - 1 - j) * nx);
  }
  return true;
}

}  // namespace karnet::mkgrid
