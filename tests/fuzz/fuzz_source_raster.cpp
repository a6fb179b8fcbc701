// karnet-mkgrid's source-raster opening on arbitrary bytes given as a file:
// format recognition, GDAL's drivers, the choice of a NetCDF variable, the
// georeferencing checks and a first read of the band, as the resampler makes
// it. A raster that is accepted has cells, a band and a usable georeferencing.
#include <cpl_conv.h>
#include <cpl_error.h>
#include <gdal.h>

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>
#include <vector>

#include "fuzz/memory_file.h"
#include "mkgrid/source_raster.h"

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  // No side files (.aux.xml) next to the inputs, no messages on the terminal.
  CPLSetConfigOption("GDAL_PAM_ENABLED", "NO");
  CPLSetConfigOption("GDAL_DISABLE_READDIR_ON_OPEN", "EMPTY_DIR");
  CPLSetConfigOption("CPL_VSIL_CURL_ALLOWED_EXTENSIONS", ".none");
  CPLSetErrorHandler(CPLQuietErrorHandler);
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using namespace karnet::mkgrid;
  const karnet::fuzz::MemoryFile file(data, size);
  // The first byte of the input picks the variable option, as a user may
  // give --variable or not.
  const std::string variable = size > 0 && (data[0] & 1) == 0 ? "" : "z";
  SourceRaster source;
  std::string error;
  if (!openSourceRaster(file.path(), variable, &source, &error)) {
    if (error.empty()) std::abort();
    return 0;
  }
  if (source.width < 1 || source.height < 1 || source.band == nullptr || !source.dataset) {
    std::abort();
  }
  const double* t = source.transform;
  if (!std::isfinite(t[0]) || !std::isfinite(t[3]) || t[1] * t[5] - t[2] * t[4] == 0.0) {
    std::abort();
  }
  if (!std::isfinite(source.scale) || !std::isfinite(source.offset) || source.scale == 0.0) {
    std::abort();
  }
  // A corner of the band, read the way the resampler reads it.
  const int w = std::min(source.width, 16);
  const int h = std::min(source.height, 16);
  std::vector<double> values(static_cast<std::size_t>(w) * static_cast<std::size_t>(h));
  if (GDALRasterIO(source.band, GF_Read, 0, 0, w, h, values.data(), w, h, GDT_Float64, 0, 0) ==
      CE_None) {
    volatile double sum = 0.0;
    for (double v : values) sum = sum + v;
  }
  (void)source.looksLikeDegrees();
  return 0;
}
