#ifndef KARNET_TESTS_GRIDFILE_NC_TEST_FILES_H_
#define KARNET_TESTS_GRIDFILE_NC_TEST_FILES_H_

// Small NetCDF files made on the spot with the NetCDF C API, and a scratch
// directory that disappears with the test.

#include <netcdf.h>
#include <stdlib.h>

#include <cstdio>
#include <filesystem>
#include <fstream>
#include <initializer_list>
#include <iterator>
#include <stdexcept>
#include <string>
#include <vector>

namespace karnet::test {

inline void ncCheck(int status, const char* what) {
  if (status != NC_NOERR) {
    throw std::runtime_error(std::string(what) + ": " + nc_strerror(status));
  }
}

class ScratchDir {
 public:
  ScratchDir() {
    std::string pattern = (std::filesystem::temp_directory_path() / "karnet-grd-XXXXXX").string();
    if (mkdtemp(pattern.data()) == nullptr) throw std::runtime_error("mkdtemp");
    path_ = pattern;
  }
  ~ScratchDir() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
  }
  ScratchDir(const ScratchDir&) = delete;
  ScratchDir& operator=(const ScratchDir&) = delete;

  std::string file(const std::string& name) const { return path_ + "/" + name; }
  const std::string& path() const { return path_; }
  // Names of everything in the directory, hidden files included.
  std::vector<std::string> entries() const {
    std::vector<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(path_)) {
      names.push_back(entry.path().filename().string());
    }
    return names;
  }

 private:
  std::string path_;
};

inline std::string readBytes(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  return std::string(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
}

inline void writeBytes(const std::string& path, const std::string& bytes) {
  std::ofstream out(path, std::ios::binary);
  out << bytes;
}

// Output of a shell command (ncdump and the like).
inline std::string commandOutput(const std::string& command) {
  std::string output;
  FILE* pipe = popen(command.c_str(), "r");
  if (pipe == nullptr) return output;
  char buffer[4096];
  std::size_t n;
  while ((n = std::fread(buffer, 1, sizeof buffer, pipe)) > 0) output.append(buffer, n);
  pclose(pipe);
  return output;
}

// A NetCDF file being defined; every call throws on a NetCDF error.
class NcBuilder {
 public:
  explicit NcBuilder(const std::string& path, int mode = NC_NETCDF4 | NC_CLOBBER) {
    ncCheck(nc_create(path.c_str(), mode, &ncid_), "nc_create");
  }
  ~NcBuilder() {
    if (ncid_ >= 0) nc_close(ncid_);
  }
  NcBuilder(const NcBuilder&) = delete;
  NcBuilder& operator=(const NcBuilder&) = delete;

  int dim(const char* name, std::size_t length) {
    int id = -1;
    ncCheck(nc_def_dim(ncid_, name, length, &id), "nc_def_dim");
    return id;
  }
  int var(const char* name, nc_type type, std::initializer_list<int> dims) {
    std::vector<int> ids(dims);
    int id = -1;
    ncCheck(nc_def_var(ncid_, name, type, static_cast<int>(ids.size()), ids.data(), &id),
            "nc_def_var");
    return id;
  }
  // A coordinate variable with an optional spacing attribute (spacing <= -1e300: none).
  int coordinate(const char* name, int dimid, double spacing = -1e301) {
    const int id = var(name, NC_DOUBLE, {dimid});
    text(id, "units", "m");
    if (spacing > -1e300) number(id, "spacing", spacing);
    return id;
  }
  void text(int varid, const char* name, const std::string& value) {
    ncCheck(nc_put_att_text(ncid_, varid, name, value.size(), value.c_str()), "att text");
  }
  void number(int varid, const char* name, double value) {
    ncCheck(nc_put_att_double(ncid_, varid, name, NC_DOUBLE, 1, &value), "att double");
  }
  void numbers(int varid, const char* name, std::initializer_list<double> values) {
    std::vector<double> v(values);
    ncCheck(nc_put_att_double(ncid_, varid, name, NC_DOUBLE, v.size(), v.data()), "att double");
  }
  void floats(int varid, const char* name, std::initializer_list<float> values) {
    std::vector<float> v(values);
    ncCheck(nc_put_att_float(ncid_, varid, name, NC_FLOAT, v.size(), v.data()), "att float");
  }
  void fill(int varid, float value) {
    ncCheck(nc_put_att_float(ncid_, varid, "_FillValue", NC_FLOAT, 1, &value), "fill");
  }
  // The grid-mapping variable with its four attributes.
  int crs(const char* name = "crs", const char* projection = "LOCAL", double longitude = 10.0,
          double latitude = 20.0, double orientation = 0.0) {
    const int id = var(name, NC_INT, {});
    text(id, "projection", projection);
    number(id, "origin_longitude", longitude);
    number(id, "origin_latitude", latitude);
    number(id, "orientation", orientation);
    return id;
  }
  void endDef() { ncCheck(nc_enddef(ncid_), "nc_enddef"); }
  void put(int varid, const std::vector<double>& values) {
    ncCheck(nc_put_var_double(ncid_, varid, values.data()), "put double");
  }
  void put(int varid, const std::vector<float>& values) {
    ncCheck(nc_put_var_float(ncid_, varid, values.data()), "put float");
  }
  void put(int varid, const std::vector<short>& values) {
    ncCheck(nc_put_var_short(ncid_, varid, values.data()), "put short");
  }
  void put(int varid, const std::vector<int>& values) {
    ncCheck(nc_put_var_int(ncid_, varid, values.data()), "put int");
  }
  void close() {
    ncCheck(nc_close(ncid_), "nc_close");
    ncid_ = -1;
  }
  int id() const { return ncid_; }

 private:
  int ncid_ = -1;
};

inline std::vector<double> steps(std::size_t count, double step, double first = 0.0) {
  std::vector<double> values(count);
  for (std::size_t i = 0; i < count; ++i) values[i] = first + static_cast<double>(i) * step;
  return values;
}

// A bathymetry file of the platform layout: item "bathymetry"(y, x) with
// values value(i, j), crs and the given float global attributes.
template <typename ValueAt>
void makeBathymetry(const std::string& path, std::size_t nx, std::size_t ny, double dx,
                    double dy, ValueAt valueAt,
                    std::initializer_list<std::pair<const char*, std::vector<float>>> blocks = {
                        {"Q84_Misc", {12.5f, -1e-30f, -900.0f, 10.0f, -1e-30f, -1e-30f, -1e-30f}}}) {
  NcBuilder nc(path);
  const int y = nc.dim("y", ny);
  const int x = nc.dim("x", nx);
  const int xv = nc.coordinate("x", x, dx);
  const int yv = nc.coordinate("y", y, dy);
  const int item = nc.var("bathymetry", NC_FLOAT, {y, x});
  nc.fill(item, -1e-30f);
  nc.text(item, "grid_mapping", "crs");
  nc.crs("crs", "UTM-32", 9.1234, 55.321, 12.5);
  for (const auto& block : blocks) {
    ncCheck(nc_put_att_float(nc.id(), NC_GLOBAL, block.first, NC_FLOAT, block.second.size(),
                             block.second.data()),
            "block");
  }
  nc.endDef();
  nc.put(xv, steps(nx, dx));
  nc.put(yv, steps(ny, dy));
  std::vector<float> values(nx * ny);
  for (std::size_t j = 0; j < ny; ++j) {
    for (std::size_t i = 0; i < nx; ++i) values[j * nx + i] = valueAt(i, j);
  }
  nc.put(item, values);
  nc.close();
}

}  // namespace karnet::test

#endif  // KARNET_TESTS_GRIDFILE_NC_TEST_FILES_H_
