// Reading gridded files: items and their axes, geographic information, custom
// blocks (float global attributes), statistics and the values of a time step.
#include <netcdf.h>
#include <sys/stat.h>

#include <algorithm>
#include <cfloat>
#include <cmath>
#include <cstdio>
#include <cerrno>
#include <cstring>
#include <memory>
#include <set>
#include <sstream>
#include <string>
#include <vector>

#include "gridfile/classic_header.h"
#include "gridfile/grid_file.h"
#include "gridfile/grid_file_internal.h"

namespace karnet {
namespace {

// Values read per NetCDF call while streaming through an item or an axis.
constexpr std::size_t kChunkValues = std::size_t{1} << 20;
// Steps of an equidistant axis may deviate from the mean step by less than this.
constexpr double kEvenTolerance = 1e-6;
// A custom block longer than this is not a custom block of ours.
constexpr std::size_t kMaxBlockValues = std::size_t{1} << 24;

bool isNumericType(nc_type type) {
  switch (type) {
    case NC_BYTE: case NC_UBYTE: case NC_SHORT: case NC_USHORT: case NC_INT: case NC_UINT:
    case NC_INT64: case NC_UINT64: case NC_FLOAT: case NC_DOUBLE:
      return true;
    default:
      return false;
  }
}

std::string variableName(int ncid, int varid) {
  char name[NC_MAX_NAME + 1] = "";
  if (nc_inq_varname(ncid, varid, name) != NC_NOERR) return std::string();
  return name;
}

std::string dimensionName(int ncid, int dimid) {
  char name[NC_MAX_NAME + 1] = "";
  if (nc_inq_dimname(ncid, dimid, name) != NC_NOERR) return std::string();
  return name;
}

// A text attribute (char or a single string); false when absent or of another type.
bool textAttribute(int ncid, int varid, const char* name, std::string* text) {
  nc_type type = NC_NAT;
  std::size_t length = 0;
  if (nc_inq_att(ncid, varid, name, &type, &length) != NC_NOERR) return false;
  if (type == NC_CHAR) {
    std::string value(length, '\0');
    if (length > 0 && nc_get_att_text(ncid, varid, name, value.data()) != NC_NOERR) return false;
    while (!value.empty() && value.back() == '\0') value.pop_back();
    *text = value;
    return true;
  }
  if (type == NC_STRING && length == 1) {
    char* value = nullptr;
    if (nc_get_att_string(ncid, varid, name, &value) != NC_NOERR) return false;
    *text = value != nullptr ? value : "";
    nc_free_string(1, &value);
    return true;
  }
  return false;
}

// A single finite number; false when absent, of a text type, or not one finite value.
bool numberAttribute(int ncid, int varid, const char* name, double* value) {
  nc_type type = NC_NAT;
  std::size_t length = 0;
  if (nc_inq_att(ncid, varid, name, &type, &length) != NC_NOERR) return false;
  if (!isNumericType(type) || length != 1) return false;
  double v = 0.0;
  if (nc_get_att_double(ncid, varid, name, &v) != NC_NOERR) return false;
  if (!std::isfinite(v)) return false;
  *value = v;
  return true;
}

bool hasAttribute(int ncid, int varid, const char* name) {
  return nc_inq_attid(ncid, varid, name, nullptr) == NC_NOERR;
}

// The variable named in a grid_mapping attribute: its first word, also in
// the "crs: x y" form.
std::string gridMappingName(int ncid, int varid) {
  std::string text;
  if (!textAttribute(ncid, varid, "grid_mapping", &text)) return std::string();
  const std::size_t begin = text.find_first_not_of(" \t");
  if (begin == std::string::npos) return std::string();
  std::size_t end = text.find_first_of(" \t:", begin);
  if (end == std::string::npos) end = text.size();
  return text.substr(begin, end - begin);
}

bool isCoordinateVariable(int ncid, int varid, const std::string& name) {
  int ndims = 0;
  if (nc_inq_varndims(ncid, varid, &ndims) != NC_NOERR || ndims != 1) return false;
  int dimid = -1;
  if (nc_inq_vardimid(ncid, varid, &dimid) != NC_NOERR) return false;
  return dimensionName(ncid, dimid) == name;
}

// Fill value and packing of an item. An item whose packing attributes are not
// single finite numbers cannot be read.
void describeValues(int ncid, GrdItem& item) {
  item.usable = isNumericType(item.type);
  double fill = 0.0;
  nc_type type = NC_NAT;
  std::size_t length = 0;
  if (nc_inq_att(ncid, item.varid, "_FillValue", &type, &length) == NC_NOERR && length == 1 &&
      isNumericType(type) && nc_get_att_double(ncid, item.varid, "_FillValue", &fill) == NC_NOERR) {
    item.hasFill = true;
    item.fillRaw = fill;
    if (std::isnan(fill)) {
      item.deleteValue = std::nanf("");
    } else if (std::fabs(fill) > FLT_MAX) {
      item.deleteValue = fill > 0 ? INFINITY : -INFINITY;
    } else {
      item.deleteValue = static_cast<float>(fill);
    }
  }
  if (hasAttribute(ncid, item.varid, "scale_factor")) {
    item.packed = true;
    if (!numberAttribute(ncid, item.varid, "scale_factor", &item.scale)) item.usable = false;
  }
  if (hasAttribute(ncid, item.varid, "add_offset")) {
    item.packed = true;
    if (!numberAttribute(ncid, item.varid, "add_offset", &item.offset)) item.usable = false;
  }
}

// Reads the items and custom blocks of an open file into the header.
bool readStructure(int ncid, GrdHeader& header) {
  int nvars = 0;
  int natts = 0;
  if (nc_inq_nvars(ncid, &nvars) != NC_NOERR || nc_inq_natts(ncid, &natts) != NC_NOERR) {
    return false;
  }
  // Grid mappings and auxiliary coordinates (lon, lat of a result) are no items.
  std::set<std::string> mappings = {"crs"};
  for (int v = 0; v < nvars; ++v) {
    const std::string mapping = gridMappingName(ncid, v);
    if (!mapping.empty()) mappings.insert(mapping);
    std::string coordinates;
    if (textAttribute(ncid, v, "coordinates", &coordinates)) {
      std::istringstream words(coordinates);
      std::string word;
      while (words >> word) mappings.insert(word);
    }
  }
  for (int v = 0; v < nvars; ++v) {
    const std::string name = variableName(ncid, v);
    if (name.empty()) return false;
    if (mappings.count(name) != 0 || isCoordinateVariable(ncid, v, name)) continue;
    auto item = std::make_unique<GrdItem>();
    item->header = &header;
    item->varid = v;
    item->varName = name;
    int ndims = 0;
    if (nc_inq_var(ncid, v, nullptr, &item->type, &ndims, nullptr, nullptr) != NC_NOERR) {
      return false;
    }
    std::vector<int> dimids(static_cast<std::size_t>(ndims));
    if (ndims > 0 && nc_inq_vardimid(ncid, v, dimids.data()) != NC_NOERR) return false;
    std::size_t first = 0;
    if (ndims > 0 && dimensionName(ncid, dimids[0]) == "time") {
      item->hasTime = true;
      if (nc_inq_dimlen(ncid, dimids[0], &item->steps) != NC_NOERR) return false;
      first = 1;
    }
    for (std::size_t d = first; d < dimids.size(); ++d) {
      GrdAxisInfo axis;
      axis.dimid = dimids[d];
      axis.name = dimensionName(ncid, dimids[d]);
      if (nc_inq_dimlen(ncid, dimids[d], &axis.length) != NC_NOERR) return false;
      item->spatial.push_back(axis);
    }
    describeValues(ncid, *item);
    header.items.push_back(std::move(item));
  }
  for (int a = 0; a < natts; ++a) {
    char name[NC_MAX_NAME + 1] = "";
    nc_type type = NC_NAT;
    std::size_t length = 0;
    if (nc_inq_attname(ncid, NC_GLOBAL, a, name) != NC_NOERR ||
        nc_inq_att(ncid, NC_GLOBAL, name, &type, &length) != NC_NOERR) {
      return false;
    }
    if (type != NC_FLOAT || length > kMaxBlockValues) continue;
    auto block = std::make_unique<GrdCustomBlock>();
    block->name = name;
    block->values.resize(length);
    if (length > 0 && nc_get_att_float(ncid, NC_GLOBAL, name, block->values.data()) != NC_NOERR) {
      return false;
    }
    header.blocks.push_back(std::move(block));
  }
  grdLinkBlocks(header);
  return true;
}

// Decides whether an axis is equidistant and finds its spacing: the
// coordinate variable's spacing attribute, else the even step of its values;
// a one-node axis without either has spacing 0. Spacings must be positive
// (coordinates run from the origin node outwards).
void examineAxis(int ncid, GrdAxisInfo& axis) {
  if (axis.examined) return;
  axis.examined = true;
  axis.equidistant = false;
  axis.spacing = 0.0;
  int varid = -1;
  const bool hasCoordinate = nc_inq_varid(ncid, axis.name.c_str(), &varid) == NC_NOERR &&
                             isCoordinateVariable(ncid, varid, axis.name);
  if (!hasCoordinate) {
    axis.equidistant = axis.length == 1;
    return;
  }
  if (hasAttribute(ncid, varid, "spacing")) {
    double spacing = 0.0;
    if (!numberAttribute(ncid, varid, "spacing", &spacing)) return;
    if (spacing < 0.0 || (spacing == 0.0 && axis.length > 1)) return;
    axis.equidistant = true;
    axis.spacing = spacing;
    return;
  }
  if (axis.length == 1) {
    axis.equidistant = true;
    return;
  }
  nc_type type = NC_NAT;
  if (nc_inq_vartype(ncid, varid, &type) != NC_NOERR || !isNumericType(type)) return;
  double firstValue = 0.0;
  double lastValue = 0.0;
  const std::size_t firstIndex = 0;
  const std::size_t lastIndex = axis.length - 1;
  if (nc_get_var1_double(ncid, varid, &firstIndex, &firstValue) != NC_NOERR ||
      nc_get_var1_double(ncid, varid, &lastIndex, &lastValue) != NC_NOERR) {
    return;
  }
  const double step = (lastValue - firstValue) / static_cast<double>(axis.length - 1);
  if (!std::isfinite(step) || step <= 0.0) return;
  std::vector<double> values(std::min(axis.length, kChunkValues));
  double previous = firstValue;
  for (std::size_t begin = 0; begin < axis.length; begin += values.size()) {
    const std::size_t count = std::min(values.size(), axis.length - begin);
    if (nc_get_vara_double(ncid, varid, &begin, &count, values.data()) != NC_NOERR) return;
    for (std::size_t i = 0; i < count; ++i) {
      if (begin + i > 0) {
        const double deviation = std::fabs((values[i] - previous) - step);
        if (!(deviation < kEvenTolerance * step)) return;
      }
      previous = values[i];
    }
  }
  axis.equidistant = true;
  axis.spacing = step;
}

int readNcid(const GrdItem* item) {
  if (item == nullptr || item->header == nullptr || !item->header->reading ||
      !item->header->readFile) {
    return -1;
  }
  return item->header->readFile->ncid;
}

// Values of one time step of the item, within the size limits of the engine's grids.
bool stepValueCount(const GrdItem& item, std::int64_t* count) {
  std::int64_t total = 1;
  for (const GrdAxisInfo& axis : item.spatial) {
    if (axis.length < 1 || axis.length > static_cast<std::size_t>(kGrdMaxStepValues)) return false;
    total *= static_cast<std::int64_t>(axis.length);
    if (total > kGrdMaxStepValues) return false;
  }
  *count = total;
  return true;
}

float toFloat(double value) {
  if (std::isnan(value)) return std::nanf("");
  if (value > FLT_MAX) return INFINITY;
  if (value < -FLT_MAX) return -INFINITY;
  return static_cast<float>(value);
}

// Turns stored values into item values: stored fill values become the
// delete value, every other value is unpacked.
void convertValues(const GrdItem& item, const double* raw, std::size_t count, float* out) {
  for (std::size_t i = 0; i < count; ++i) {
    const double r = raw[i];
    if (item.hasFill && (r == item.fillRaw || (std::isnan(r) && std::isnan(item.fillRaw)))) {
      out[i] = item.deleteValue;
    } else if (item.packed) {
      out[i] = toFloat(r * item.scale + item.offset);
    } else {
      out[i] = toFloat(r);
    }
  }
}

// Streams the values of one time step through sink in storage order (x
// fastest), at most kChunkValues at a time. sink(values, count) returns false
// to stop.
template <typename Sink>
bool streamStep(int ncid, const GrdItem& item, std::size_t step, Sink sink) {
  const std::size_t offset = item.hasTime ? 1 : 0;
  const std::size_t rank = item.spatial.size();
  std::vector<std::size_t> start(rank + offset, 0);
  std::vector<std::size_t> count(rank + offset, 1);
  if (item.hasTime) start[0] = step;
  // Split along an axis: the values inside one of its nodes (the product of
  // the axes after it) fit a chunk; the split axis is read in pieces.
  std::size_t split = 0;
  std::size_t inner = 1;
  for (std::size_t d = rank; d-- > 0;) {
    split = d;
    if (d == 0 || inner * item.spatial[d].length > kChunkValues) break;
    inner *= item.spatial[d].length;
  }
  std::size_t piece = rank == 0 ? 1 : std::max<std::size_t>(1, kChunkValues / inner);
  if (rank > 0) piece = std::min(piece, item.spatial[split].length);
  for (std::size_t d = split; d < rank; ++d) count[d + offset] = item.spatial[d].length;
  std::vector<double> raw(piece * inner);
  std::vector<float> values(raw.size());
  std::vector<std::size_t> index(rank, 0);  // odometer over the axes before split
  while (true) {
    for (std::size_t d = 0; d < split; ++d) start[d + offset] = index[d];
    const std::size_t length = rank == 0 ? 1 : item.spatial[split].length;
    for (std::size_t at = 0; at < length; at += piece) {
      const std::size_t n = std::min(piece, length - at);
      if (rank > 0) {
        start[split + offset] = at;
        count[split + offset] = n;
      }
      if (nc_get_vara_double(ncid, item.varid, start.data(), count.data(), raw.data()) !=
          NC_NOERR) {
        return false;
      }
      convertValues(item, raw.data(), n * inner, values.data());
      if (!sink(values.data(), n * inner)) return false;
    }
    std::size_t d = split;
    while (d > 0) {
      --d;
      if (++index[d] < item.spatial[d].length) break;
      index[d] = 0;
      if (d == 0) return true;
    }
    if (split == 0) return true;
  }
}

}  // namespace

int grdFileRead(const char* fileName, GrdHeader** header, GrdFile** file, std::string* reason) {
  std::string ignored;
  if (reason == nullptr) reason = &ignored;
  if (header == nullptr || file == nullptr) return 1;
  *header = nullptr;
  *file = nullptr;
  if (fileName == nullptr || fileName[0] == '\0') {
    *reason = "no file name";
    return 1;
  }
  struct stat info;
  if (stat(fileName, &info) != 0) {
    *reason = std::strerror(errno);
    return 1;
  }
  if (!S_ISREG(info.st_mode)) {
    *reason = "not a regular file";
    return 1;
  }
  // A classic-format header that declares more than the file holds would make
  // the NetCDF library allocate and convert the declared sizes first.
  if (std::FILE* stream = std::fopen(fileName, "rb")) {
    const ClassicHeader header =
        checkClassicHeader(stream, static_cast<std::uint64_t>(info.st_size));
    std::fclose(stream);
    if (header == ClassicHeader::kBroken) {
      *reason = "its NetCDF header declares more than the file holds (a cut or damaged file)";
      return 1;
    }
  } else {
    *reason = std::strerror(errno);
    return 1;
  }
  // A relative name goes to NetCDF as a path, never as a remote (URL) address.
  std::string path = fileName;
  if (path[0] != '/') path = "./" + path;
  int ncid = -1;
  const int status = nc_open(path.c_str(), NC_NOWRITE, &ncid);
  if (status != NC_NOERR) {
    *reason = std::string("cannot be read as NetCDF: ") + nc_strerror(status);
    return 1;
  }
  auto h = std::make_unique<GrdHeader>();
  h->reading = true;
  h->fileName = fileName;
  h->readFile = std::make_unique<GrdFile>();
  h->readFile->header = h.get();
  h->readFile->ncid = ncid;
  if (!readStructure(ncid, *h)) {
    nc_close(ncid);
    h->readFile->ncid = -1;
    *reason = "its variables and attributes cannot be read";
    return 1;
  }
  *file = h->readFile.get();
  *header = h.release();
  return 0;
}

int grdGetItemAxisType(GrdItem* item) {
  const int ncid = readNcid(item);
  if (ncid < 0 || !item->usable) return 0;
  const std::size_t rank = item->spatial.size();
  if (rank != 2 && rank != 3) return 0;
  std::int64_t values = 0;
  if (!stepValueCount(*item, &values)) return 0;
  for (GrdAxisInfo& axis : item->spatial) {
    examineAxis(ncid, axis);
    if (!axis.equidistant) return 0;
  }
  return rank == 2 ? 5 : 10;
}

int grdGetItemAxisEqD2(GrdItem* item, std::int32_t* jStart, std::int32_t* kStart,
                       std::int32_t* nx, std::int32_t* ny, double* xOrigin, double* yOrigin,
                       float* dx, float* dy) {
  const bool ok = grdGetItemAxisType(item) == 5;
  const GrdAxisInfo* x = ok ? &item->spatial[1] : nullptr;
  const GrdAxisInfo* y = ok ? &item->spatial[0] : nullptr;
  if (jStart != nullptr) *jStart = 0;
  if (kStart != nullptr) *kStart = 0;
  if (xOrigin != nullptr) *xOrigin = 0.0;
  if (yOrigin != nullptr) *yOrigin = 0.0;
  if (nx != nullptr) *nx = ok ? static_cast<std::int32_t>(x->length) : 0;
  if (ny != nullptr) *ny = ok ? static_cast<std::int32_t>(y->length) : 0;
  if (dx != nullptr) *dx = ok ? static_cast<float>(x->spacing) : 0.0f;
  if (dy != nullptr) *dy = ok ? static_cast<float>(y->spacing) : 0.0f;
  return ok ? 0 : 1;
}

int grdGetGeoInfoUTMProj(GrdHeader* header, std::string* projection, double* longitude,
                         double* latitude, double* orientation) {
  if (header == nullptr) return 1;
  std::string text;
  double lon = 0.0, lat = 0.0, orient = 0.0;
  if (header->reading) {
    if (!header->readFile) return 1;
    const int ncid = header->readFile->ncid;
    std::string name;
    if (!header->items.empty()) name = gridMappingName(ncid, header->items[0]->varid);
    if (name.empty()) name = "crs";
    int varid = -1;
    if (nc_inq_varid(ncid, name.c_str(), &varid) != NC_NOERR) return 1;
    if (!textAttribute(ncid, varid, "projection", &text) ||
        !numberAttribute(ncid, varid, "origin_longitude", &lon) ||
        !numberAttribute(ncid, varid, "origin_latitude", &lat) ||
        !numberAttribute(ncid, varid, "orientation", &orient)) {
      return 1;
    }
  } else {
    if (!header->geoSet) return 1;
    text = header->projection;
    lon = header->longitude;
    lat = header->latitude;
    orient = header->orientation;
  }
  if (projection != nullptr) *projection = text;
  if (longitude != nullptr) *longitude = lon;
  if (latitude != nullptr) *latitude = lat;
  if (orientation != nullptr) *orientation = orient;
  return 0;
}

int grdGetCustomBlockRef(GrdHeader* header, GrdCustomBlock** first) {
  if (first != nullptr) *first = nullptr;
  if (header == nullptr || first == nullptr || header->blocks.empty()) return 1;
  *first = header->blocks.front().get();
  return 0;
}

int grdGetCustomBlock(GrdCustomBlock* block, std::int32_t* type, const char** name,
                      std::int32_t* count, const float** values, GrdCustomBlock** next) {
  if (block == nullptr) return 1;
  if (type != nullptr) *type = 1;
  if (name != nullptr) *name = block->name.c_str();
  if (count != nullptr) *count = static_cast<std::int32_t>(block->values.size());
  if (values != nullptr) *values = block->values.data();
  if (next != nullptr) *next = block->next;
  return 0;
}

namespace {

// The least and greatest of values that are neither not-a-number nor the
// delete value, in the order they come.
struct ValueRange {
  float deleteValue;
  bool any = false;
  float low = 0.0f, high = 0.0f;

  void add(const float* values, std::size_t count) {
    for (std::size_t i = 0; i < count; ++i) {
      const float v = values[i];
      if (std::isnan(v) || v == deleteValue) continue;
      if (!any) {
        low = high = v;
        any = true;
      } else {
        low = std::min(low, v);
        high = std::max(high, v);
      }
    }
  }
  void give(double* minimum, double* maximum, double* third) const {
    if (minimum != nullptr) *minimum = any ? low : deleteValue;
    if (maximum != nullptr) *maximum = any ? high : deleteValue;
    if (third != nullptr) *third = deleteValue;
  }
};

}  // namespace

int grdGetItemStatsGlobal(GrdItem* item, double* minimum, double* maximum, double* third) {
  const int ncid = readNcid(item);
  if (ncid < 0 || !item->usable) return 1;
  std::int64_t perStep = 0;
  if (!stepValueCount(*item, &perStep)) return 1;
  ValueRange range{item->deleteValue};
  auto sink = [&range](const float* values, std::size_t count) {
    range.add(values, count);
    return true;
  };
  for (std::size_t step = 0; step < item->steps; ++step) {
    if (!streamStep(ncid, *item, step, sink)) return 1;
  }
  range.give(minimum, maximum, third);
  return 0;
}

int grdReadItemStatsAndFirstStep(GrdHeader* header, GrdFile* file, double* minimum,
                                 double* maximum, double* time, float* data) {
  if (header == nullptr || header->items.empty()) return 1;
  GrdItem* item = header->items[0].get();
  if (item->steps != 1) {
    return grdGetItemStatsGlobal(item, minimum, maximum, nullptr) != 0 ||
                   grdFindBlockDynamic(header, file) != 0 ||
                   grdReadItemTimeStep(header, file, time, data) != 0
               ? 1
               : 0;
  }
  // One step: the statistics go over the very values read, in the same order.
  std::int64_t perStep = 0;
  if (grdFindBlockDynamic(header, file) != 0 || !stepValueCount(*item, &perStep) ||
      grdReadItemTimeStep(header, file, time, data) != 0) {
    return 1;
  }
  ValueRange range{item->deleteValue};
  range.add(data, static_cast<std::size_t>(perStep));
  range.give(minimum, maximum, nullptr);
  return 0;
}

int grdFindBlockDynamic(GrdHeader* header, GrdFile* file) {
  if (header == nullptr || file == nullptr || !header->reading ||
      header->readFile.get() != file) {
    return 1;
  }
  file->nextStep = 0;
  return 0;
}

int grdReadItemTimeStep(GrdHeader* header, GrdFile* file, double* time, float* data) {
  if (header == nullptr || file == nullptr || data == nullptr || !header->reading ||
      header->readFile.get() != file || header->items.empty()) {
    return 1;
  }
  GrdItem& item = *header->items[0];
  std::int64_t perStep = 0;
  if (!item.usable || !stepValueCount(item, &perStep) || file->nextStep >= item.steps) return 1;
  const std::size_t step = file->nextStep;
  float* out = data;
  auto sink = [&out](const float* values, std::size_t count) {
    std::memcpy(out, values, count * sizeof(float));
    out += count;
    return true;
  };
  if (!streamStep(file->ncid, item, step, sink)) return 1;
  double stepTime = 0.0;
  int timeVar = -1;
  if (item.hasTime && nc_inq_varid(file->ncid, "time", &timeVar) == NC_NOERR &&
      isCoordinateVariable(file->ncid, timeVar, "time")) {
    if (nc_get_var1_double(file->ncid, timeVar, &step, &stepTime) != NC_NOERR) stepTime = 0.0;
  }
  if (time != nullptr) *time = stepTime;
  ++file->nextStep;
  return 0;
}

}  // namespace karnet
