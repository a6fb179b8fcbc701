// The bathymetry reader on arbitrary bytes given as a NetCDF file: the whole
// read as run setup and data scanning make it, header and values.
#include <netcdf.h>

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>

#include "fuzz/memory_file.h"
#include "gridfile/classic_header.h"
#include "input/bathymetry_read.h"
#include "support/file_description.h"
#include "support/float_grid.h"

namespace {

// Files whose variables declare more values than this are passed over: they
// are valid inputs, only too slow to stream through many times a second.
constexpr std::size_t kMaxDeclaredValues = std::size_t{1} << 22;

bool smallEnough(const char* path, std::uint64_t size) {
  using karnet::ClassicHeader;
  // The harness's own look into the file must not hand NetCDF what the reader
  // refuses to hand it.
  std::FILE* stream = std::fopen(path, "rb");
  if (stream == nullptr) return true;
  const ClassicHeader header = karnet::checkClassicHeader(stream, size);
  std::fclose(stream);
  if (header == ClassicHeader::kBroken) return true;  // the reader refuses it early
  int ncid = -1;
  if (nc_open(path, NC_NOWRITE, &ncid) != NC_NOERR) return true;  // the reader fails early
  bool small = true;
  int nvars = 0;
  if (nc_inq_nvars(ncid, &nvars) == NC_NOERR) {
    for (int v = 0; v < nvars && small; ++v) {
      int ndims = 0;
      int dimids[NC_MAX_VAR_DIMS];
      if (nc_inq_varndims(ncid, v, &ndims) != NC_NOERR || ndims > NC_MAX_VAR_DIMS ||
          nc_inq_vardimid(ncid, v, dimids) != NC_NOERR) {
        continue;
      }
      std::size_t total = 1;
      for (int d = 0; d < ndims; ++d) {
        std::size_t length = 0;
        if (nc_inq_dimlen(ncid, dimids[d], &length) != NC_NOERR) continue;
        if (length > kMaxDeclaredValues) length = kMaxDeclaredValues + 1;
        total *= length == 0 ? 1 : length;
        if (total > kMaxDeclaredValues) small = false;
      }
    }
  }
  nc_close(ncid);
  return small;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using namespace karnet;
  const fuzz::MemoryFile file(data, size);
  if (!smallEnough(file.path(), size)) return 0;
  FileDescription* description = descriptionNew(2);
  if (description == nullptr) std::abort();
  FloatGrid2D grid{};
  if (bathymetryRead(file.path(), *description, 1, grid) != 0) {
    // A successful read describes exactly the values it delivered.
    const std::int64_t nx = std::int64_t{description->axes[1].lastIndex} + 1;
    const std::int64_t ny = std::int64_t{description->axes[2].lastIndex} + 1;
    if (nx < 1 || ny < 1 || grid.data == nullptr || grid.nj != nx || grid.nk != ny) std::abort();
    volatile float sum = 0;
    for (std::int64_t i = 0; i < nx * ny; ++i) sum = sum + grid.data[i];
  }
  grid2DFree(grid);
  descriptionFree(description);
  return 0;
}
