// karnet-obs's Argo profile reader on arbitrary bytes given as a NetCDF
// file. The first byte picks the options (raw values, a time window, the
// variable); the rest is the file. Every row handed on is named by the file,
// profile and level, and a refusal names the file.
#include <netcdf.h>

#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>

#include "fuzz/memory_file.h"
#include "gridfile/classic_header.h"
#include "obs/argo_reader.h"

namespace {

// Files declaring more values than this are passed over: valid inputs (a
// netCDF-4 file holds unwritten values in no space at all), only too slow to
// read many times a second.
constexpr std::size_t kMaxDeclaredValues = std::size_t{1} << 22;

bool smallEnough(const char* path, std::uint64_t size) {
  // The reader refuses a classic header that declares more than the file
  // holds before the NetCDF library sees it; so must this look.
  std::FILE* stream = std::fopen(path, "rb");
  if (stream == nullptr) return true;
  const karnet::ClassicHeader header = karnet::checkClassicHeader(stream, size);
  std::fclose(stream);
  if (header == karnet::ClassicHeader::kBroken) return true;
  int ncid = -1;
  if (nc_open(path, NC_NOWRITE, &ncid) != NC_NOERR) return true;  // the reader fails early
  bool small = true;
  int ndims = 0;
  if (nc_inq_ndims(ncid, &ndims) == NC_NOERR) {
    std::size_t total = 1;
    for (const char* name : {"N_PROF", "N_LEVELS"}) {
      int dim = -1;
      std::size_t length = 0;
      if (nc_inq_dimid(ncid, name, &dim) != NC_NOERR || nc_inq_dimlen(ncid, dim, &length) != NC_NOERR) {
        continue;
      }
      if (length > kMaxDeclaredValues) small = false;
      if (length > 0) total *= length;
      if (total > kMaxDeclaredValues) small = false;
    }
  }
  nc_close(ncid);
  return small;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using namespace karnet::obs;
  if (size == 0) return 0;
  ReadOptions options;
  const std::uint8_t pick = data[0];
  options.raw = (pick & 1) != 0;
  options.needTime = (pick & 2) != 0;
  if ((pick & 4) != 0) options.variable = "psal";
  const karnet::fuzz::MemoryFile file(data + 1, size - 1);
  const std::string path = file.path();
  if (!looksLikeNetcdf(path)) return 0;  // karnet-obs reads such a file as a table
  if (!smallEnough(path.c_str(), size - 1)) return 0;
  try {
    readArgo(
        path, options,
        [&](const Row& row, const Where& where) {
          if (where().compare(0, path.size() + 10, path + ": profile ") != 0) std::abort();
          if (!row.isPressure) std::abort();
          if (row.skip == Skip::None && (std::isnan(row.lon) || std::isnan(row.lat) ||
                                         std::isnan(row.vertical) || std::isnan(row.value))) {
            std::abort();
          }
        },
        [&](const std::string& note) {
          if (note.compare(0, path.size(), path) != 0) std::abort();
        });
  } catch (const ObsError& e) {
    if (std::string(e.what()).compare(0, path.size(), path) != 0) std::abort();
  }
  return 0;
}
