#ifndef KARNET_GRIDFILE_CLASSIC_HEADER_H_
#define KARNET_GRIDFILE_CLASSIC_HEADER_H_

#include <cstdint>
#include <cstdio>

namespace karnet {

// A first look at a file in the classic NetCDF formats (CDF-1, CDF-2, CDF-5)
// before the NetCDF library opens it. The library allocates whatever sizes a
// header declares before it reads them, so a file of a few hundred bytes can
// make it take gigabytes and minutes, and values missing from a cut file read
// as zeros. This walk over the header checks that every declared name,
// attribute and list fits in the file, and so do the values of every variable
// of two or more dimensions.
enum class ClassicHeader {
  kNotClassic,  // another format (netCDF-4/HDF5, or not NetCDF at all)
  kSound,       // a classic header whose declarations all lie within the file
  kBroken,      // a classic file that declares more than it holds
};

// Looks at the open stream from its start; fileSize is the file's size in bytes.
ClassicHeader checkClassicHeader(std::FILE* stream, std::uint64_t fileSize);

}  // namespace karnet

#endif  // KARNET_GRIDFILE_CLASSIC_HEADER_H_
