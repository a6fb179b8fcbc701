#ifndef KARNET_TESTS_GRIDFILE_NC_TEST_FILES_H_
#define KARNET_TESTS_GRIDFILE_NC_TEST_FILES_H_

// NetCDF files made on the spot from CDL text (ncgen) with large value arrays
// put in through the NetCDF C API, scratch directories and shell command output.

#include <gtest/gtest.h>
#include <netcdf.h>
#include <stdlib.h>
#include <sys/wait.h>

#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <initializer_list>
#include <iterator>
#include <stdexcept>
#include <string>
#include <vector>

#include "common/temp_dir.h"

namespace karnet::test {

// Tests that each get a scratch directory, gone with the test, and a file name in it.
class ScratchTest : public testing::Test {
 protected:
  std::string file(const std::string& name) const { return dir + "/" + name; }
  // Names of everything in the directory, hidden files included, sorted.
  std::vector<std::string> entries() const {
    std::vector<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(dir)) {
      names.push_back(entry.path().filename().string());
    }
    std::sort(names.begin(), names.end());
    return names;
  }

  const TempDir scratch;
  const std::string dir = scratch.path();
  const std::string path = file("test.nc");
};

inline std::string readBytes(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  return std::string(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
}

inline void writeBytes(const std::string& path, const std::string& bytes) {
  std::ofstream(path, std::ios::binary) << bytes;
}

// Output (stdout) of a shell command; its exit code on request.
inline std::string commandOutput(const std::string& command, int* exitCode = nullptr) {
  std::string output;
  FILE* pipe = popen(command.c_str(), "r");
  if (pipe == nullptr) return output;
  char buffer[4096];
  std::size_t n;
  while ((n = std::fread(buffer, 1, sizeof buffer, pipe)) > 0) output.append(buffer, n);
  const int status = pclose(pipe);
  if (exitCode != nullptr) *exitCode = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  return output;
}

inline std::string ncdump(const std::string& path, const std::string& options = "-h") {
  return commandOutput("ncdump " + options + " '" + path + "'");
}

inline void expectParts(const std::string& text, std::initializer_list<std::string> parts) {
  for (const std::string& part : parts) {
    EXPECT_NE(text.find(part), std::string::npos) << "lacks: " << part << "\nin:\n" << text;
  }
}

inline std::string cdlNumber(double value) {
  char text[32];
  std::snprintf(text, sizeof text, "%.17g", value);
  return text;
}

// A NetCDF file of the given kind (classic, nc4, cdf5, ...) made by ncgen from CDL text.
inline void ncgen(const std::string& path, const std::string& cdl, const std::string& kind = "nc4") {
  const std::string source = path + ".cdl";
  writeBytes(source, cdl);
  int code = -1;
  const std::string out =
      commandOutput("ncgen -k " + kind + " -o '" + path + "' '" + source + "' 2>&1", &code);
  std::remove(source.c_str());
  if (code != 0) throw std::runtime_error("ncgen failed: " + out + "\n" + cdl);
}

// A NetCDF-4 file from CDL text: what comes between "netcdf name {" and "}".
inline void makeNc(const std::string& path, const std::string& cdl) {
  ncgen(path, "netcdf f {\n" + cdl + "\n}\n");
}

// The values of one variable, put into a file made before.
inline void putValues(const std::string& path, const char* variable,
                      const std::vector<float>& values) {
  int ncid = -1, varid = -1;
  if (nc_open(path.c_str(), NC_WRITE, &ncid) != NC_NOERR ||
      nc_inq_varid(ncid, variable, &varid) != NC_NOERR ||
      nc_put_var_float(ncid, varid, values.data()) != NC_NOERR || nc_close(ncid) != NC_NOERR) {
    throw std::runtime_error(std::string("cannot put the values of ") + variable);
  }
}

// CDL of dimensions y and x and their coordinates with the given spacings;
// the variables section is open.
inline std::string plane(std::size_t ny, std::size_t nx, double dy = 1, double dx = 1) {
  return "dimensions: y = " + std::to_string(ny) + "; x = " + std::to_string(nx) +
         ";\nvariables: double x(x); x:spacing = " + cdlNumber(dx) +
         "; double y(y); y:spacing = " + cdlNumber(dy) + ";\n";
}

// CDL of a grid-mapping variable with its four attributes.
inline std::string crs(const std::string& name = "crs", const std::string& projection = "LOCAL",
                       double longitude = 10, double latitude = 20, double orientation = 0) {
  return "int " + name + "; " + name + ":projection = \"" + projection + "\"; " + name +
         ":origin_longitude = " + cdlNumber(longitude) + "; " + name +
         ":origin_latitude = " + cdlNumber(latitude) + "; " + name +
         ":orientation = " + cdlNumber(orientation) + ";\n";
}

// A bathymetry file of the platform layout: item "bathymetry"(y, x) with
// values valueAt(i, j), its crs and the given global attributes (CDL).
template <typename ValueAt>
void makeBathymetry(
    const std::string& path, std::size_t nx, std::size_t ny, double dx, double dy,
    ValueAt valueAt,
    const std::string& blocks = ":Q84_Misc = 12.5f, -1e-30f, -900.f, 10.f, -1e-30f, -1e-30f, "
                                "-1e-30f;") {
  makeNc(path, plane(ny, nx, dy, dx) +
                   "float bathymetry(y, x); bathymetry:_FillValue = -1e-30f; "
                   "bathymetry:grid_mapping = \"crs\";\n" +
                   crs("crs", "UTM-32", 9.1234, 55.321, 12.5) + blocks);
  std::vector<float> values(nx * ny);
  for (std::size_t j = 0; j < ny; ++j) {
    for (std::size_t i = 0; i < nx; ++i) values[j * nx + i] = valueAt(i, j);
  }
  putValues(path, "bathymetry", values);
}

}  // namespace karnet::test

#endif  // KARNET_TESTS_GRIDFILE_NC_TEST_FILES_H_
