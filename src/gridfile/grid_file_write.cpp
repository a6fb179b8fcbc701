// Writing gridded files: the header settings, the NetCDF layout of a new file
// (assembled in memory) and its time steps.
#include <netcdf.h>
#include <netcdf_mem.h>

#include <algorithm>
#include <atomic>
#include <cctype>
#include <cmath>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <set>
#include <string>
#include <vector>

#include "gridfile/grid_file.h"
#include "gridfile/grid_file_internal.h"
#include "gridfile/units.h"

namespace karnet {
namespace {

constexpr int kMaxItems = 1024;
constexpr std::int32_t kMaxBlockValues = 1 << 24;
// Chunks of an item variable hold at most this many values.
constexpr std::size_t kChunkValues = std::size_t{1} << 22;
constexpr const char* kTimeUnits = "seconds since 1900-02-28 00:00:00";

bool writable(const GrdHeader* header) {
  return header != nullptr && !header->reading && header->writeFile == nullptr;
}

bool ownedBy(const GrdItem* item, const GrdHeader* header) {
  if (item == nullptr || header == nullptr) return false;
  for (const auto& own : header->items) {
    if (own.get() == item) return true;
  }
  return false;
}

// A NetCDF variable name from an item's key text: letters, digits and '_'
// are kept, every other character becomes '_'.
std::string itemVariableName(const GrdItem& item) {
  if (item.key.empty()) return std::string("item_").append(std::to_string(item.itemType));
  std::string name = item.key;
  for (char& c : name) {
    const unsigned char u = static_cast<unsigned char>(c);
    if (!(std::isalnum(u) != 0 && u < 0x80) && c != '_') c = '_';
  }
  return name;
}

// A custom block name must be a plain attribute name that cannot be taken for
// one of the file's own global attributes.
bool validBlockName(const char* name) {
  if (name == nullptr || name[0] == '\0' || std::strlen(name) > NC_MAX_NAME) return false;
  if (std::strcmp(name, "Conventions") == 0 || std::strcmp(name, "title") == 0) return false;
  if (std::isalpha(static_cast<unsigned char>(name[0])) == 0) return false;
  for (const char* p = name; *p != '\0'; ++p) {
    const unsigned char u = static_cast<unsigned char>(*p);
    if (!(std::isalnum(u) != 0 || u == '_' || u == '-' || u == '.') || u >= 0x80) return false;
  }
  return true;
}

bool validAxis(std::int32_t count, float origin, float spacing) {
  if (count < 1 || !std::isfinite(origin) || !std::isfinite(spacing)) return false;
  return count == 1 ? spacing >= 0.0f : spacing > 0.0f;
}

int setAxis(GrdItem* item, int axisUnit, int dims, const std::int32_t* counts,
            const float* origins, const float* spacings) {
  if (item == nullptr || !writable(item->header) || axisUnit != kGrdMetreCode) return 1;
  std::int64_t total = 1;
  for (int d = 0; d < dims; ++d) {
    if (!validAxis(counts[d], origins[d], spacings[d])) return 1;
    total *= counts[d];
    if (total > kGrdMaxStepValues) return 1;
  }
  item->axisDims = dims;
  for (int d = 0; d < 3; ++d) {
    item->counts[d] = d < dims ? counts[d] : 0;
    item->origins[d] = d < dims ? origins[d] : 0.0f;
    item->spacings[d] = d < dims ? spacings[d] : 0.0f;
  }
  return 0;
}

bool sameAxes(const GrdItem& a, const GrdItem& b) {
  if (a.axisDims != b.axisDims) return false;
  for (int d = 0; d < 3; ++d) {
    if (a.counts[d] != b.counts[d] || a.origins[d] != b.origins[d] ||
        a.spacings[d] != b.spacings[d]) {
      return false;
    }
  }
  return true;
}

// Collects the first NetCDF error of a sequence of calls.
struct NcStatus {
  int error = NC_NOERR;
  bool ok() const { return error == NC_NOERR; }
  void operator()(int status) {
    if (error == NC_NOERR && status != NC_NOERR) error = status;
  }
};

void putText(NcStatus& status, int ncid, int varid, const char* name, const std::string& text) {
  status(nc_put_att_text(ncid, varid, name, text.size(), text.c_str()));
}

void putDouble(NcStatus& status, int ncid, int varid, const char* name, double value) {
  status(nc_put_att_double(ncid, varid, name, NC_DOUBLE, 1, &value));
}

struct Layout {
  int dimTime = -1;
  int dims[3] = {-1, -1, -1};  // x, y, z
  int coordVars[3] = {-1, -1, -1};
  int timeVar = -1;
  int lonVar = -1;
  int latVar = -1;
  std::vector<int> itemVars;
};

const GrdGeoreference* georeferenceOf(const GrdHeader& header) {
  return header.georeferenced ? &header.georeference : nullptr;
}

// The coordinate attributes of the georeferenced layout: depths below the
// surface on z; projection coordinates, or distances along a turned grid's
// axes, on x and y.
void describeGeoreferencedAxis(NcStatus& status, int ncid, int v, int d,
                               const GrdGeoreference& g) {
  if (d == 2) {
    putText(status, ncid, v, "standard_name", "depth");
    putText(status, ncid, v, "long_name", "depth below the sea surface");
    putText(status, ncid, v, "positive", "down");
    return;
  }
  if (g.projectedXY) {
    putText(status, ncid, v, "standard_name",
            d == 0 ? "projection_x_coordinate" : "projection_y_coordinate");
    putText(status, ncid, v, "long_name",
            d == 0 ? "x coordinate of projection" : "y coordinate of projection");
    return;
  }
  putText(status, ncid, v, "long_name",
          d == 0 ? "distance from the origin node along the grid's x axis"
                 : "distance from the origin node along the grid's y axis");
}

void defineAxis(NcStatus& status, int ncid, Layout& layout, int d, const GrdItem& item,
                const GrdGeoreference* georeference) {
  static const char* const kNames[3] = {"x", "y", "z"};
  static const char* const kAxes[3] = {"X", "Y", "Z"};
  static const char* const kLongNames[3] = {
      "distance from the origin node along the grid's x axis",
      "distance from the origin node along the grid's y axis",
      "distance from the origin node along the grid's z axis"};
  status(nc_def_dim(ncid, kNames[d], static_cast<std::size_t>(item.counts[d]), &layout.dims[d]));
  if (!status.ok()) return;
  status(nc_def_var(ncid, kNames[d], NC_DOUBLE, 1, &layout.dims[d], &layout.coordVars[d]));
  if (!status.ok()) return;
  const int v = layout.coordVars[d];
  putText(status, ncid, v, "units", "m");
  putText(status, ncid, v, "axis", kAxes[d]);
  putDouble(status, ncid, v, "spacing", static_cast<double>(item.spacings[d]));
  if (georeference != nullptr) {
    describeGeoreferencedAxis(status, ncid, v, d, *georeference);
    return;
  }
  putText(status, ncid, v, "long_name", kLongNames[d]);
  if (d == 2) putText(status, ncid, v, "positive", "up");
}

void defineItem(NcStatus& status, int ncid, const GrdHeader& header, Layout& layout,
                const GrdItem& item, const std::string& name) {
  std::vector<int> dims;
  std::vector<std::size_t> chunks;
  if (header.timeAxis) {
    dims.push_back(layout.dimTime);
    chunks.push_back(1);
  }
  for (int d = item.axisDims - 1; d >= 0; --d) {
    dims.push_back(layout.dims[d]);
    chunks.push_back(1);
  }
  // Chunks of whole rows (or row pieces), as many rows as fit.
  const std::size_t nx = static_cast<std::size_t>(item.counts[0]);
  const std::size_t ny = static_cast<std::size_t>(item.counts[1]);
  chunks[chunks.size() - 1] = std::min(nx, kChunkValues);
  chunks[chunks.size() - 2] = std::max<std::size_t>(1, std::min(ny, kChunkValues / nx));
  int varid = -1;
  status(nc_def_var(ncid, name.c_str(), NC_FLOAT, static_cast<int>(dims.size()), dims.data(),
                    &varid));
  if (!status.ok()) return;
  layout.itemVars.push_back(varid);
  status(nc_def_var_chunking(ncid, varid, NC_CHUNKED, chunks.data()));
  status(nc_def_var_deflate(ncid, varid, 1, 1, kGrdDeflateLevel));
  status(nc_def_var_fill(ncid, varid, 0, &header.deleteFloat));
  putText(status, ncid, varid, "long_name", item.key);
  putText(status, ncid, varid, "units", unitCfUnits(item.unit));
  const std::string standardName = unitCfStandardName(item.itemType);
  if (!standardName.empty()) putText(status, ncid, varid, "standard_name", standardName);
  const int type = item.itemType;
  status(nc_put_att_int(ncid, varid, "item_type", NC_INT, 1, &type));
  const GrdGeoreference* g = georeferenceOf(header);
  if (header.geoSet && (g == nullptr || g->itemGridMapping)) {
    putText(status, ncid, varid, "grid_mapping", "crs");
  }
  if (g != nullptr && g->rowGeolocation) putText(status, ncid, varid, "coordinates", "lon lat");
}

// lon(y, x) and lat(y, x), chunked and compressed by rows.
void defineGeolocation(NcStatus& status, int ncid, Layout& layout, const GrdItem& item) {
  const int dims[2] = {layout.dims[1], layout.dims[0]};
  const std::size_t nx = static_cast<std::size_t>(item.counts[0]);
  const std::size_t ny = static_cast<std::size_t>(item.counts[1]);
  const std::size_t chunks[2] = {std::max<std::size_t>(1, std::min(ny, kChunkValues / 2 / nx)),
                                 std::min(nx, kChunkValues / 2)};
  struct Variable {
    const char* name;
    const char* standardName;
    const char* longName;
    const char* units;
    int* varid;
  };
  const Variable variables[2] = {
      {"lon", "longitude", "longitude of the node", "degrees_east", &layout.lonVar},
      {"lat", "latitude", "latitude of the node", "degrees_north", &layout.latVar}};
  for (const Variable& v : variables) {
    status(nc_def_var(ncid, v.name, NC_DOUBLE, 2, dims, v.varid));
    if (!status.ok()) return;
    status(nc_def_var_chunking(ncid, *v.varid, NC_CHUNKED, chunks));
    status(nc_def_var_deflate(ncid, *v.varid, 1, 1, 1));
    putText(status, ncid, *v.varid, "standard_name", v.standardName);
    putText(status, ncid, *v.varid, "long_name", v.longName);
    putText(status, ncid, *v.varid, "units", v.units);
  }
}

void defineCrs(NcStatus& status, int ncid, const GrdHeader& header) {
  int varid = -1;
  status(nc_def_var(ncid, "crs", NC_INT, 0, nullptr, &varid));
  if (!status.ok()) return;
  putText(status, ncid, varid, "projection", header.projection);
  putDouble(status, ncid, varid, "origin_longitude", header.longitude);
  putDouble(status, ncid, varid, "origin_latitude", header.latitude);
  putDouble(status, ncid, varid, "orientation", header.orientation);
  const std::string wkt = grdProjectionWkt(header.projection);
  if (!wkt.empty()) putText(status, ncid, varid, "crs_wkt", wkt);
  if (!header.georeferenced) return;
  const std::string spatialRef = grdProjectionSpatialRef(header.projection);
  if (!spatialRef.empty()) putText(status, ncid, varid, "spatial_ref", spatialRef);
  for (const GrdCfAttribute& a : grdCfGridMapping(header.projection)) {
    if (a.numbers.empty()) {
      putText(status, ncid, varid, a.name.c_str(), a.text);
    } else {
      status(nc_put_att_double(ncid, varid, a.name.c_str(), NC_DOUBLE, a.numbers.size(),
                               a.numbers.data()));
    }
  }
}

// Names of the item variables: distinct from each other and from the
// file's own variables.
std::vector<std::string> itemNames(const GrdHeader& header) {
  std::set<std::string> taken = {"x", "y", "z", "time", "crs"};
  if (header.georeferenced && header.georeference.rowGeolocation) {
    taken.insert("lon");
    taken.insert("lat");
  }
  std::vector<std::string> names;
  for (std::size_t i = 0; i < header.items.size(); ++i) {
    std::string name = itemVariableName(*header.items[i]);
    if (taken.count(name) != 0) name.append("_").append(std::to_string(i + 1));
    while (taken.count(name) != 0) name += "_";
    taken.insert(name);
    names.push_back(name);
  }
  return names;
}

// An item's extra attributes and its link to an ancillary item, once every
// item variable has its name.
void describeItemFurther(NcStatus& status, int ncid, const GrdHeader& header, int varid,
                         const GrdItem& item, const std::vector<std::string>& names) {
  for (const auto& [name, text] : item.attributes) putText(status, ncid, varid, name.c_str(), text);
  for (std::size_t i = 0; i < header.items.size(); ++i) {
    if (header.items[i].get() == item.ancillary) {
      putText(status, ncid, varid, "ancillary_variables", names[i]);
    }
  }
}

bool defineFile(int ncid, const GrdHeader& header, Layout& layout) {
  NcStatus status;
  const GrdItem& first = *header.items[0];
  const GrdGeoreference* g = georeferenceOf(header);
  if (header.timeAxis) status(nc_def_dim(ncid, "time", NC_UNLIMITED, &layout.dimTime));
  for (int d = first.axisDims - 1; d >= 0 && status.ok(); --d) {
    defineAxis(status, ncid, layout, d, first, g);
  }
  if (header.timeAxis && status.ok()) {
    status(nc_def_var(ncid, "time", NC_DOUBLE, 1, &layout.dimTime, &layout.timeVar));
    putText(status, ncid, layout.timeVar, "units", kTimeUnits);
    putText(status, ncid, layout.timeVar, "calendar", "standard");
    putText(status, ncid, layout.timeVar, "axis", "T");
    putText(status, ncid, layout.timeVar, "long_name", "time");
  }
  const std::vector<std::string> names = itemNames(header);
  for (std::size_t i = 0; i < header.items.size() && status.ok(); ++i) {
    defineItem(status, ncid, header, layout, *header.items[i], names[i]);
  }
  for (std::size_t i = 0; i < header.items.size() && status.ok(); ++i) {
    describeItemFurther(status, ncid, header, layout.itemVars[i], *header.items[i], names);
  }
  if (g != nullptr && g->rowGeolocation && status.ok()) {
    defineGeolocation(status, ncid, layout, first);
  }
  if (header.geoSet && status.ok()) defineCrs(status, ncid, header);
  putText(status, ncid, NC_GLOBAL, "Conventions", "CF-1.8");
  bool titled = false;
  if (g != nullptr) {
    for (const auto& [name, text] : g->globalAttributes) {
      if (text.empty()) continue;
      putText(status, ncid, NC_GLOBAL, name.c_str(), text);
      titled = titled || name == "title";
    }
  }
  if (!header.title.empty() && !titled) {
    putText(status, ncid, NC_GLOBAL, "title", header.title);
  }
  for (const auto& block : header.blocks) {
    status(nc_put_att_float(ncid, NC_GLOBAL, block->name.c_str(), NC_FLOAT,
                            block->values.size(), block->values.data()));
  }
  status(nc_enddef(ncid));
  for (int d = 0; d < first.axisDims && status.ok(); ++d) {
    std::vector<double> values(static_cast<std::size_t>(first.counts[d]));
    double start = static_cast<double>(first.origins[d]);
    double step = static_cast<double>(first.spacings[d]);
    if (g != nullptr) {
      // Depths fall from the first (deepest) level upwards.
      if (d == 2) {
        start = g->firstDepth;
        step = -step;
      } else {
        start = d == 0 ? g->xFirst : g->yFirst;
      }
    }
    for (std::size_t i = 0; i < values.size(); ++i) {
      values[i] = start + static_cast<double>(i) * step;
    }
    status(nc_put_var_double(ncid, layout.coordVars[d], values.data()));
  }
  // lon and lat get their values once the values go into chunks
  // (writeGeolocation).
  return status.ok();
}

bool validOpenFile(const GrdHeader* header, const GrdFile* file) {
  return header != nullptr && file != nullptr && !header->reading &&
         header->writeFile == file && file->forWriting &&
         (file->ncid >= 0 || file->chunks != nullptr);
}

}  // namespace

int grdHeaderCreate(int itemCount, const char* fileName, const char* title, int, int, int,
                    GrdHeader** header) {
  if (header == nullptr) return 1;
  *header = nullptr;
  if (itemCount < 1 || itemCount > kMaxItems) return 1;
  auto h = std::make_unique<GrdHeader>();
  h->fileName = fileName != nullptr ? fileName : "";
  h->title = title != nullptr ? title : "";
  for (int i = 0; i < itemCount; ++i) {
    auto item = std::make_unique<GrdItem>();
    item->header = h.get();
    h->items.push_back(std::move(item));
  }
  *header = h.release();
  return 0;
}

int grdSetCompressionThreads(GrdHeader* header, int threads) {
  if (!writable(header) || threads < 1) return 1;
  header->compressionThreads = threads;
  return 0;
}

int grdSetDeleteValFloat(GrdHeader* header, float value) {
  if (!writable(header)) return 1;
  header->deleteFloat = value;
  return 0;
}

int grdSetDeleteValDouble(GrdHeader* header, double value) {
  if (!writable(header)) return 1;
  header->deleteDouble = value;
  return 0;
}

int grdSetDataType(GrdHeader* header, int dataType) {
  if (!writable(header)) return 1;
  header->dataType = dataType;
  return 0;
}

int grdSetEqTimeAxis(GrdHeader* header, int unit, double start, double step, int firstStep) {
  if (!writable(header)) return 1;
  header->timeAxis = true;
  header->timeUnit = unit;
  header->timeStart = start;
  header->timeStep = step;
  header->firstStep = firstStep;
  return 0;
}

int grdSetItemInfo(GrdHeader* header, GrdItem* item, std::int32_t itemType, const char* key,
                   std::int32_t unit, int) {
  if (!writable(header) || !ownedBy(item, header)) return 1;
  item->itemType = itemType;
  item->key = key != nullptr ? key : "";
  item->unit = unit;
  item->described = true;
  return 0;
}

int grdSetItemAttribute(GrdItem* item, const char* name, const char* text) {
  if (item == nullptr || !writable(item->header) || name == nullptr || text == nullptr) return 1;
  if (name[0] == '\0' || std::strlen(name) > NC_MAX_NAME || std::strcmp(name, "_FillValue") == 0) {
    return 1;
  }
  for (auto& attribute : item->attributes) {
    if (attribute.first == name) {
      attribute.second = text;
      return 0;
    }
  }
  item->attributes.emplace_back(name, text);
  return 0;
}

int grdSetItemAncillary(GrdItem* item, GrdItem* ancillary) {
  if (item == nullptr || !writable(item->header) || item == ancillary) return 1;
  if (!ownedBy(ancillary, item->header)) return 1;
  item->ancillary = ancillary;
  return 0;
}

int grdSetItemAxisEqD3(GrdItem* item, int axisUnit, std::int32_t nx, std::int32_t ny,
                       std::int32_t nz, float x0, float y0, float z0, float dx, float dy,
                       float dz) {
  const std::int32_t counts[3] = {nx, ny, nz};
  const float origins[3] = {x0, y0, z0};
  const float spacings[3] = {dx, dy, dz};
  return setAxis(item, axisUnit, 3, counts, origins, spacings);
}

int grdSetItemAxisEqD2(GrdItem* item, int axisUnit, std::int32_t nx, std::int32_t ny, float x0,
                       float y0, float dx, float dy) {
  const std::int32_t counts[2] = {nx, ny};
  const float origins[2] = {x0, y0};
  const float spacings[2] = {dx, dy};
  return setAxis(item, axisUnit, 2, counts, origins, spacings);
}

int grdAddCustomBlock(GrdHeader* header, int type, const char* name, std::int32_t count,
                      const float* values) {
  if (!writable(header) || type != 1 || !validBlockName(name)) return 1;
  if (count < 0 || count > kMaxBlockValues || (count > 0 && values == nullptr)) return 1;
  for (const auto& block : header->blocks) {
    if (block->name == name) return 1;
  }
  for (const auto& attribute : header->georeference.globalAttributes) {
    if (attribute.first == name) return 1;
  }
  auto block = std::make_unique<GrdCustomBlock>();
  block->name = name;
  block->values.assign(values, values + count);
  header->blocks.push_back(std::move(block));
  grdLinkBlocks(*header);
  return 0;
}

int grdSetGeoInfoUTMProj(GrdHeader* header, const char* projection, double longitude,
                         double latitude, double orientation) {
  if (!writable(header) || projection == nullptr) return 1;
  if (!std::isfinite(longitude) || !std::isfinite(latitude) || !std::isfinite(orientation)) {
    return 1;
  }
  header->projection = projection;
  header->longitude = longitude;
  header->latitude = latitude;
  header->orientation = orientation;
  header->geoSet = true;
  return 0;
}

int grdSetGeoreference(GrdHeader* header, const GrdGeoreference& georeference) {
  if (!writable(header)) return 1;
  if (!std::isfinite(georeference.firstDepth) || !std::isfinite(georeference.xFirst) ||
      !std::isfinite(georeference.yFirst)) {
    return 1;
  }
  std::set<std::string> names;
  for (const auto& [name, text] : georeference.globalAttributes) {
    // Float attributes are custom blocks; these are texts and must not clash
    // with the file's own attributes or with each other.
    if (!validBlockName(name.c_str()) && name != "title") return 1;
    if (name == "Conventions" || !names.insert(name).second) return 1;
    for (const auto& block : header->blocks) {
      if (block->name == name) return 1;
    }
  }
  header->georeference = georeference;
  header->georeferenced = true;
  return 0;
}

namespace {
bool startChunks(GrdFile& file);
bool writeGeolocation(GrdFile& file, const GrdGeoreference& g, const GrdItem& item);
}  // namespace

int grdFileCreate(const char* fileName, GrdHeader* header, GrdFile** file) {
  if (file == nullptr) return 1;
  *file = nullptr;
  if (!writable(header) || fileName == nullptr || fileName[0] == '\0') return 1;
  for (const auto& item : header->items) {
    if (!item->described || item->axisDims == 0 || !sameAxes(*item, *header->items[0])) return 1;
  }
  if (!grdCanCreate(fileName)) return 1;
  int ncid = -1;
  if (nc_create_mem(fileName, NC_NETCDF4 | NC_CLOBBER, 0, &ncid) != NC_NOERR) return 1;
  Layout layout;
  if (!defineFile(ncid, *header, layout)) {
    nc_abort(ncid);
    return 1;
  }
  auto f = std::make_unique<GrdFile>();
  f->header = header;
  f->ncid = ncid;
  f->forWriting = true;
  f->finalName = fileName;
  f->itemVar = layout.itemVars[0];
  f->itemVars = layout.itemVars;
  f->itemSteps.assign(layout.itemVars.size(), 0);
  f->timeVar = layout.timeVar;
  f->hasTime = header->timeAxis;
  f->itemNames = itemNames(*header);
  // Node positions are part of the layout: a file whose positions cannot be
  // made is not created.
  const GrdGeoreference* g = georeferenceOf(*header);
  if (g != nullptr && g->rowGeolocation &&
      (!startChunks(*f) || !writeGeolocation(*f, *g, *header->items[0]))) {
    f->chunks.reset();
    return 1;
  }
  header->writeFile = f.get();
  *file = f.release();
  return 0;
}

int grdWriteItemTimeStep(GrdHeader* header, GrdFile* file, double time, const float* data) {
  return grdWriteItemNTimeStep(header, file, 1, time, data);
}

namespace {

// The item of a write call (from 1) when the file can take its next values.
bool writableItem(const GrdHeader* header, const GrdFile* file, int itemNumber) {
  if (!validOpenFile(header, file)) return false;
  if (itemNumber < 1 || static_cast<std::size_t>(itemNumber) > file->itemVars.size()) return false;
  const std::size_t step = file->itemSteps[static_cast<std::size_t>(itemNumber - 1)];
  return !file->failed && (file->hasTime || step == 0);
}

// Hands the file from NetCDF, which laid it out, to the chunk writer that
// stores the values.
bool startChunks(GrdFile& file) {
  if (file.chunks != nullptr) return true;
  NC_memio memory{};
  const int status = nc_close_memio(file.ncid, &memory);
  file.ncid = -1;
  if (status == NC_NOERR) {
    file.chunks = ChunkWriter::open(memory.memory, memory.size, file.itemNames,
                                    file.hasTime ? "time" : "", file.header->deleteFloat);
  }
  std::free(memory.memory);
  if (file.chunks == nullptr) return false;
  file.chunks->setThreads(file.header->compressionThreads);
  return true;
}

// Fills lon and lat band by band (the rows of one chunk), the rows of a band
// made on the file's compression threads, so that only a band of each is held.
bool writeGeolocation(GrdFile& file, const GrdGeoreference& g, const GrdItem& item) {
  const auto nx = static_cast<std::int64_t>(item.counts[0]);
  const auto ny = static_cast<std::int64_t>(item.counts[1]);
  const std::int64_t band = file.chunks->chunkRows("lon");
  if (band < 1 || file.chunks->chunkRows("lat") != band) return false;
  try {
    std::vector<double> lon(static_cast<std::size_t>(std::min(band, ny) * nx));
    std::vector<double> lat(lon.size());
    const int threads = std::max(file.header->compressionThreads, 1);
    for (std::int64_t first = 0; first < ny; first += band) {
      const std::int64_t rows = std::min(band, ny - first);
      std::atomic<bool> made{true};
      // No more threads than there are rows: each thread makes its own PROJ objects.
      const auto team = static_cast<int>(std::min<std::int64_t>(threads, rows));
#pragma omp parallel for schedule(dynamic, 8) num_threads(team) if (team > 1)
      for (std::int64_t r = 0; r < rows; ++r) {
        if (!made.load(std::memory_order_relaxed)) continue;
        try {
          if (!g.rowGeolocation(static_cast<std::int32_t>(first + r), lon.data() + r * nx,
                                lat.data() + r * nx)) {
            made = false;
          }
        } catch (...) {
          made = false;
        }
      }
      if (!made || !file.chunks->writeDoubleRows("lon", first, rows, lon.data()) ||
          !file.chunks->writeDoubleRows("lat", first, rows, lat.data())) {
        return false;
      }
    }
  } catch (const std::bad_alloc&) {
    return false;
  }
  return true;
}

// Stores levels first .. first+count-1 of the time step being written of
// item n (from 0); an item without z takes level 0 only.
int writeLevels(GrdFile& file, std::size_t n, std::int64_t first, std::int64_t count,
                const float* data) {
  if (!startChunks(file) ||
      !file.chunks->writeLevels(n, file.itemSteps[n], first, count, data)) {
    file.failed = true;
    return 1;
  }
  return 0;
}

// Closes the time step being written of item n: its time and the step count.
int finishStep(GrdFile& file, std::size_t n, double time) {
  const std::size_t step = file.itemSteps[n];
  if (file.hasTime && (!startChunks(file) || !file.chunks->writeTime(step, time))) {
    file.failed = true;
    return 1;
  }
  file.itemSteps[n] = step + 1;
  file.stepsWritten = std::max(file.stepsWritten, step + 1);
  return 0;
}

}  // namespace

int grdWriteItemNTimeStep(GrdHeader* header, GrdFile* file, int itemNumber, double time,
                          const float* data) {
  if (!writableItem(header, file, itemNumber) || data == nullptr) return 1;
  const auto n = static_cast<std::size_t>(itemNumber - 1);
  const GrdItem& item = *header->items[n];
  const std::int64_t levels = item.axisDims == 3 ? item.counts[2] : 1;
  if (writeLevels(*file, n, 0, levels, data) != 0) return 1;
  return finishStep(*file, n, time);
}

int grdWriteItemLevel(GrdHeader* header, GrdFile* file, std::int32_t level, const float* data,
                      int itemNumber) {
  return grdWriteItemLevels(header, file, level, 1, data, itemNumber);
}

int grdWriteItemLevels(GrdHeader* header, GrdFile* file, std::int32_t firstLevel,
                       std::int32_t levelCount, const float* data, int itemNumber) {
  if (!writableItem(header, file, itemNumber) || data == nullptr) return 1;
  const auto n = static_cast<std::size_t>(itemNumber - 1);
  const GrdItem& item = *header->items[n];
  if (item.axisDims != 3 || firstLevel < 0 || levelCount < 1 ||
      levelCount > item.counts[2] - firstLevel) {
    return 1;
  }
  return writeLevels(*file, n, firstLevel, levelCount, data);
}

int grdFinishItemTimeStep(GrdHeader* header, GrdFile* file, double time, int itemNumber) {
  if (!writableItem(header, file, itemNumber)) return 1;
  return finishStep(*file, static_cast<std::size_t>(itemNumber - 1), time);
}

int grdFileClose(GrdHeader* header, GrdFile** file, std::string* reason) {
  if (file == nullptr || *file == nullptr) return 1;
  if (!validOpenFile(header, *file)) return 1;
  std::unique_ptr<GrdFile> f(*file);
  *file = nullptr;
  header->writeFile = nullptr;
  if (f->failed) {
    if (f->ncid >= 0) nc_abort(f->ncid);
    if (reason != nullptr) *reason = "its values could not be stored";
    return 1;
  }
  std::string error;
  bool committed = false;
  if (f->chunks != nullptr) {
    void* bytes = nullptr;
    std::size_t size = 0;
    const bool released = f->chunks->release(&bytes, &size);
    f->chunks.reset();
    if (!released) {
      if (reason != nullptr) *reason = "its values could not be stored";
      return 1;
    }
    committed = grdCommitFile(f->finalName, bytes, size, &error);
    std::free(bytes);
  } else {
    NC_memio memory{};
    const int status = nc_close_memio(f->ncid, &memory);
    if (status != NC_NOERR) {
      std::free(memory.memory);
      if (reason != nullptr) *reason = nc_strerror(status);
      return 1;
    }
    committed = grdCommitFile(f->finalName, memory.memory, memory.size, &error);
    std::free(memory.memory);
  }
  if (!committed && reason != nullptr) *reason = error;
  return committed ? 0 : 1;
}

int grdFileAbandon(GrdHeader* header, GrdFile** file) {
  if (file == nullptr || *file == nullptr) return 1;
  if (!validOpenFile(header, *file)) return 1;
  *file = nullptr;
  grdDiscardWriteFile(*header);
  return 0;
}

void grdDiscardWriteFile(GrdHeader& header) {
  GrdFile* f = header.writeFile;
  if (f == nullptr) return;
  header.writeFile = nullptr;
  if (f->ncid >= 0) nc_abort(f->ncid);
  delete f;
}

}  // namespace karnet
