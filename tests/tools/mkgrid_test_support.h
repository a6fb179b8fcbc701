#ifndef KARNET_TESTS_TOOLS_MKGRID_TEST_SUPPORT_H_
#define KARNET_TESTS_TOOLS_MKGRID_TEST_SUPPORT_H_

// Running karnet-mkgrid on rasters made on the spot, and reading back what it wrote.

#include <gdal.h>
#include <ogr_srs_api.h>

#include <cmath>
#include <numbers>
#include <stdexcept>
#include <string>
#include <vector>

#include "gridfile/grid_file.h"
#include "gridfile/nc_test_files.h"
#include "input/cartography.h"

namespace karnet::test {

// The program's output, stderr included, and its exit code.
inline std::string runMkgrid(const std::string& arguments, int* exitCode) {
  return commandOutput(std::string(KARNET_MKGRID_BINARY) + " " + arguments + " 2>&1", exitCode);
}

inline std::string quoted(const std::string& text) { return "'" + text + "'"; }

// A one-band Float64 GeoTIFF: values row by row, the northern row first;
// epsg 0 writes no CRS.
inline void writeGeoTiff(const std::string& path, int width, int height, const double transform[6],
                         int epsg, const std::vector<double>& values,
                         const double* nodata = nullptr) {
  GDALAllRegister();
  GDALDatasetH dataset = GDALCreate(GDALGetDriverByName("GTiff"), path.c_str(), width, height, 1,
                                    GDT_Float64, nullptr);
  if (dataset == nullptr) throw std::runtime_error("cannot create " + path);
  GDALSetGeoTransform(dataset, const_cast<double*>(transform));
  if (epsg != 0) {
    OGRSpatialReferenceH srs = OSRNewSpatialReference(nullptr);
    OSRImportFromEPSG(srs, epsg);
    GDALSetSpatialRef(dataset, srs);
    OSRRelease(srs);
  }
  GDALRasterBandH band = GDALGetRasterBand(dataset, 1);
  if (nodata != nullptr) GDALSetRasterNoDataValue(band, *nodata);
  const CPLErr written =
      GDALRasterIO(band, GF_Write, 0, 0, width, height, const_cast<double*>(values.data()), width,
                   height, GDT_Float64, 0, 0);
  GDALClose(dataset);
  if (written != CE_None) throw std::runtime_error("cannot write " + path);
}

// What a bathymetry file holds, read through the gridded-file layer karnet reads it with.
struct MadeGrid {
  int nx = 0, ny = 0;
  double dx = 0, dy = 0;
  std::string projection;
  double longitude = 0, latitude = 0, orientation = 0;
  float landValue = 0;
  std::vector<float> values;

  float at(int i, int j) const { return values[static_cast<std::size_t>(j) * nx + i]; }
};

inline MadeGrid readMadeGrid(const std::string& path) {
  grdInitSystem();
  GrdHeader* header = nullptr;
  GrdFile* file = nullptr;
  if (grdFileRead(path.c_str(), &header, &file) != 0)
    throw std::runtime_error("unreadable " + path);
  MadeGrid grid;
  std::int32_t j0, k0, nx, ny;
  double x0, y0;
  float dx, dy;
  GrdItem* item = grdItemD(header, 1);
  grdGetItemAxisEqD2(item, &j0, &k0, &nx, &ny, &x0, &y0, &dx, &dy);
  grid.nx = nx;
  grid.ny = ny;
  grid.dx = dx;
  grid.dy = dy;
  grdGetGeoInfoUTMProj(header, &grid.projection, &grid.longitude, &grid.latitude,
                       &grid.orientation);
  GrdCustomBlock* block = nullptr;
  if (grdGetCustomBlockRef(header, &block) == 0) {
    std::int32_t type, count;
    const char* name;
    const float* values;
    GrdCustomBlock* next;
    if (grdGetCustomBlock(block, &type, &name, &count, &values, &next) == 0 && count >= 4) {
      grid.landValue = values[3];
    }
  }
  grid.values.resize(static_cast<std::size_t>(nx) * ny);
  double time = 0;
  const bool read = grdFindBlockDynamic(header, file) == 0 &&
                    grdReadItemTimeStep(header, file, &time, grid.values.data()) == 0;
  grdHeaderDestroy(&header);
  if (!read) throw std::runtime_error("cannot read the values of " + path);
  return grid;
}

// Where karnet puts node (i, j) of a bathymetry: the origin through the
// projection, the axes turned by the orientation less the convergence there.
struct NodePlacer {
  explicit NodePlacer(const MadeGrid& g) : grid(g), map(g.projection, 0, 0, 0) {
    map.geoToProj(g.longitude, g.latitude, &x0, &y0);
    const double turn =
        (g.orientation - map.convergence(g.longitude, g.latitude)) * std::numbers::pi / 180.0;
    c = std::cos(turn);
    s = std::sin(turn);
  }
  void place(int i, int j, double* x, double* y) const {
    const double u = i * grid.dx, v = j * grid.dy;
    *x = x0 + u * c + v * s;
    *y = y0 - u * s + v * c;
  }
  const MadeGrid& grid;
  Cartography map;
  double x0 = 0, y0 = 0, c = 1, s = 0;
};

}  // namespace karnet::test

#endif  // KARNET_TESTS_TOOLS_MKGRID_TEST_SUPPORT_H_
