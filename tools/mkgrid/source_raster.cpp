// Opening the source raster: GDAL for every format, the strict reader for ESRI ASCII.
#include "mkgrid/source_raster.h"

#include <cpl_conv.h>
#include <cpl_error.h>
#include <cpl_string.h>
#include <strings.h>

#include <algorithm>
#include <cmath>
#include <fstream>
#include <vector>

#include "mkgrid/esri_ascii.h"

namespace karnet::mkgrid {
namespace {

// ESRI ASCII grids start with one of their header keywords.
bool isEsriAscii(const std::string& path) {
  std::ifstream in(path);
  std::string first;
  if (!(in >> first)) return false;
  for (const char* keyword : {"ncols", "nrows", "xllcorner", "xllcenter", "yllcorner", "yllcenter",
                              "cellsize", "nodata_value", "dx", "dy"}) {
    if (strcasecmp(first.c_str(), keyword) == 0) return true;
  }
  return false;
}

// The CRS of a grid's .prj file (same name, extension .prj or .PRJ), if any.
Srs sidecarCrs(const std::string& path, std::string* error, bool* failed) {
  *failed = false;
  const std::size_t dot = path.find_last_of("./");
  const std::string stem =
      dot != std::string::npos && path[dot] == '.' ? path.substr(0, dot) : path;
  for (const char* extension : {".prj", ".PRJ"}) {
    std::ifstream in(stem + extension);
    if (!in) continue;
    const std::string text((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
    Srs srs(OSRNewSpatialReference(nullptr));
    char** lines = CSLAddString(nullptr, text.c_str());
    const bool ok = OSRImportFromESRI(srs.get(), lines) == OGRERR_NONE ||
                    OSRSetFromUserInput(srs.get(), text.c_str()) == OGRERR_NONE;
    CSLDestroy(lines);
    if (!ok) {
      *error = stem + extension + ": not a projection file GDAL reads";
      *failed = true;
      return Srs();
    }
    OSRSetAxisMappingStrategy(srs.get(), OAMS_TRADITIONAL_GIS_ORDER);
    return srs;
  }
  return Srs();
}

bool openEsriAscii(const std::string& path, SourceRaster* source, std::string* error) {
  EsriGrid grid;
  if (!readEsriAsciiFile(path, &grid, error)) return false;
  bool failed = false;
  Srs crs = sidecarCrs(path, error, &failed);
  if (failed) return false;
  GDALDriverH memory = GDALGetDriverByName("MEM");
  Dataset dataset(memory == nullptr
                      ? nullptr
                      : GDALCreate(memory, "", grid.ncols, grid.nrows, 1, GDT_Float64, nullptr));
  if (!dataset) {
    *error = path + ": no memory for " + std::to_string(grid.ncols) + " x " +
             std::to_string(grid.nrows) + " cells";
    return false;
  }
  GDALRasterBandH band = GDALGetRasterBand(dataset.get(), 1);
  if (GDALRasterIO(band, GF_Write, 0, 0, grid.ncols, grid.nrows, grid.values.data(), grid.ncols,
                   grid.nrows, GDT_Float64, 0, 0) != CE_None) {
    *error = path + ": " + lastGdalError("cannot hold the values");
    return false;
  }
  // The header's reference is a corner or a centre; the south-west centre as
  // the header gives it, and the north-west corner for GDAL.
  source->southWestX = grid.xll + (grid.xIsCorner ? grid.dx / 2.0 : 0.0);
  source->southWestY = grid.yll + (grid.yIsCorner ? grid.dy / 2.0 : 0.0);
  const double west = grid.xIsCorner ? grid.xll : grid.xll - grid.dx / 2.0;
  const double south = grid.yIsCorner ? grid.yll : grid.yll - grid.dy / 2.0;
  const double transform[6] = {west, grid.dx, 0.0, south + grid.nrows * grid.dy, 0.0, -grid.dy};
  GDALSetGeoTransform(dataset.get(), const_cast<double*>(transform));
  std::copy(transform, transform + 6, source->transform);
  source->hasNodata = grid.hasNodata;
  source->nodata = grid.nodata;
  if (grid.hasNodata) GDALSetRasterNoDataValue(band, grid.nodata);
  source->band = band;
  source->width = grid.ncols;
  source->height = grid.nrows;
  source->crs = std::move(crs);
  source->dataset = std::move(dataset);
  source->what = "ESRI ASCII grid, " + std::to_string(grid.ncols) + " x " +
                 std::to_string(grid.nrows) + " cells";
  return true;
}

// Names (NAME, DESC) of a dataset's subdatasets.
std::vector<std::pair<std::string, std::string>> subdatasets(GDALDatasetH dataset) {
  std::vector<std::pair<std::string, std::string>> list;
  char** metadata = GDALGetMetadata(dataset, "SUBDATASETS");
  for (int n = 1;; ++n) {
    const std::string key = "SUBDATASET_" + std::to_string(n) + "_";
    const char* name = CSLFetchNameValue(metadata, (key + "NAME").c_str());
    if (name == nullptr) break;
    const char* description = CSLFetchNameValue(metadata, (key + "DESC").c_str());
    list.emplace_back(name, description != nullptr ? description : "");
  }
  return list;
}

// The variable's name in a subdataset name "DRIVER:"file":NAME".
std::string variableOf(const std::string& subdataset) {
  const std::size_t colon = subdataset.find_last_of(':');
  return colon == std::string::npos ? subdataset : subdataset.substr(colon + 1);
}

// A subdataset description "[3x4] elevation (...)" tells its dimensions.
bool isTwoDimensional(const std::string& description) {
  if (description.empty() || description[0] != '[') return false;
  const std::size_t close = description.find(']');
  if (close == std::string::npos) return false;
  const std::string shape = description.substr(1, close - 1);
  return std::count(shape.begin(), shape.end(), 'x') == 1;
}

// The dataset to read: the file itself, or the variable's subdataset.
bool pickVariable(const std::string& path, const std::string& variable, Dataset* dataset,
                  std::string* chosen, std::string* error) {
  const auto list = subdatasets(dataset->get());
  if (list.empty()) {
    const char* name =
        GDALGetMetadataItem(GDALGetRasterBand(dataset->get(), 1), "NETCDF_VARNAME", nullptr);
    if (!variable.empty() && (name == nullptr || variable != name)) {
      *error = path + ": no variable '" + variable + "'" +
               (name != nullptr ? std::string(" (its only one is '") + name + "')"
                                : std::string(" (the file is a single raster)"));
      return false;
    }
    if (name != nullptr) *chosen = name;
    return true;
  }
  std::string names;
  std::string pick;
  int twoDimensional = 0;
  for (const auto& [name, description] : list) {
    names += (names.empty() ? "" : ", ") + variableOf(name) + " " +
             description.substr(0, description.find(']') + 1);
    if (!variable.empty() && variableOf(name) == variable) pick = name;
    if (variable.empty() && isTwoDimensional(description)) {
      ++twoDimensional;
      pick = name;
    }
  }
  if (!variable.empty() && pick.empty()) {
    *error = path + ": no variable '" + variable + "' (it has " + names + ")";
    return false;
  }
  if (variable.empty() && twoDimensional != 1) {
    *error = path + ": " +
             (twoDimensional == 0 ? std::string("no 2-D variable")
                                  : std::string("several 2-D variables")) +
             " (it has " + names + "); pick one with --variable NAME";
    return false;
  }
  CPLErrorReset();
  Dataset sub(
      GDALOpenEx(pick.c_str(), GDAL_OF_RASTER | GDAL_OF_READONLY, nullptr, nullptr, nullptr));
  if (!sub || GDALGetRasterCount(sub.get()) < 1) {
    *error = path + ": cannot read variable '" + variableOf(pick) +
             "': " + lastGdalError("GDAL gives no raster");
    return false;
  }
  *dataset = std::move(sub);
  *chosen = variableOf(pick);
  return true;
}

bool openWithGdal(const std::string& path, const std::string& variable, SourceRaster* source,
                  std::string* error) {
  CPLErrorReset();
  Dataset dataset(
      GDALOpenEx(path.c_str(), GDAL_OF_RASTER | GDAL_OF_READONLY, nullptr, nullptr, nullptr));
  if (!dataset) {
    std::ifstream probe(path);
    *error = probe ? path + ": not a raster GDAL reads (" + lastGdalError("unknown format") + ")"
                   : "cannot open " + path;
    return false;
  }
  const std::string driver = GDALGetDriverShortName(GDALGetDatasetDriver(dataset.get()));
  std::string chosen;
  if (!pickVariable(path, variable, &dataset, &chosen, error)) return false;
  if (GDALGetRasterCount(dataset.get()) < 1) {
    *error = path + ": holds no raster band";
    return false;
  }
  source->width = GDALGetRasterXSize(dataset.get());
  source->height = GDALGetRasterYSize(dataset.get());
  if (source->width < 1 || source->height < 1) {
    *error = path + ": holds no cells";
    return false;
  }
  if (GDALGetGeoTransform(dataset.get(), source->transform) != CE_None) {
    *error = path +
             ": has no georeferencing (no cell size and position); 2-D coordinate "
             "arrays and ground control points are not taken";
    return false;
  }
  const double* t = source->transform;
  if (!(std::isfinite(t[0]) && std::isfinite(t[3])) || t[1] * t[5] - t[2] * t[4] == 0.0) {
    *error = path + ": its georeferencing is degenerate (zero or non-finite cell size)";
    return false;
  }
  source->band = GDALGetRasterBand(dataset.get(), 1);
  int has = 0;
  source->nodata = GDALGetRasterNoDataValue(source->band, &has);
  source->hasNodata = has != 0;
  source->scale = GDALGetRasterScale(source->band, nullptr);
  source->offset = GDALGetRasterOffset(source->band, nullptr);
  if (!std::isfinite(source->scale) || !std::isfinite(source->offset) || source->scale == 0.0) {
    source->scale = 1.0;
    source->offset = 0.0;
  }
  if (OGRSpatialReferenceH crs = GDALGetSpatialRef(dataset.get())) {
    source->crs = cloneTraditional(crs);
  }
  source->position(0.5, source->height - 0.5, &source->southWestX, &source->southWestY);
  source->what = driver + (chosen.empty() ? std::string() : " variable '" + chosen + "'") + ", " +
                 std::to_string(source->width) + " x " + std::to_string(source->height) + " cells";
  const int bands = GDALGetRasterCount(dataset.get());
  if (bands > 1) source->what += " (band 1 of " + std::to_string(bands) + ")";
  source->dataset = std::move(dataset);
  return true;
}

}  // namespace

bool SourceRaster::looksLikeDegrees() const {
  for (const double p : {0.0, static_cast<double>(width)}) {
    for (const double l : {0.0, static_cast<double>(height)}) {
      double x = 0.0, y = 0.0;
      position(p, l, &x, &y);
      if (!(x >= -180.0 && x <= 360.0 && y >= -90.0 && y <= 90.0)) return false;
    }
  }
  return true;
}

bool openSourceRaster(const std::string& path, const std::string& variable, SourceRaster* source,
                      std::string* error) {
  initGdal();
  *source = SourceRaster();
  if (isEsriAscii(path)) {
    if (!variable.empty()) {
      *error = path + ": an ESRI ASCII grid has no variables (--variable " + variable + ")";
      return false;
    }
    return openEsriAscii(path, source, error);
  }
  return openWithGdal(path, variable, source, error);
}

}  // namespace karnet::mkgrid
