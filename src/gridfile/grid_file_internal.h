#ifndef KARNET_GRIDFILE_GRID_FILE_INTERNAL_H_
#define KARNET_GRIDFILE_GRID_FILE_INTERNAL_H_

// The records behind the handles of grid_file.h, shared by the reading and the
// writing half of the layer. Nothing outside src/gridfile includes this.

#include <netcdf.h>
#include <proj.h>

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "gridfile/chunk_writer.h"
#include "gridfile/grid_file.h"

namespace karnet {

inline constexpr float kGrdDefaultDelete = -1e-30f;
// Axis unit code of the metre, the only one accepted on writing.
inline constexpr int kGrdMetreCode = 1000;
// Largest number of values of one time step of an item (the grids of the
// engine count their elements in signed 32 bits).
inline constexpr std::int64_t kGrdMaxStepValues = 2147483647;

// One spatial axis of an item as found in a file.
struct GrdAxisInfo {
  int dimid = -1;
  std::string name;
  std::size_t length = 0;
  bool examined = false;  // equidistant and spacing are known
  bool equidistant = false;
  double spacing = 0.0;
};

struct GrdItem {
  GrdHeader* header = nullptr;

  // ---- reading ----
  int varid = -1;
  std::string varName;
  nc_type type = NC_NAT;
  bool hasTime = false;
  std::size_t steps = 1;
  std::vector<GrdAxisInfo> spatial;  // outermost first: [z,] y, x
  bool usable = false;               // numeric values and sound packing attributes
  bool hasFill = false;
  double fillRaw = 0.0;              // _FillValue as stored (before unpacking)
  float deleteValue = kGrdDefaultDelete;
  bool packed = false;
  double scale = 1.0;
  double offset = 0.0;

  // ---- writing ----
  bool described = false;
  std::int32_t itemType = 0;
  std::string key;
  std::int32_t unit = 0;
  int axisDims = 0;                  // 2 or 3 once an axis is set
  std::int32_t counts[3] = {0, 0, 0};  // x, y, z
  float origins[3] = {0, 0, 0};
  float spacings[3] = {0, 0, 0};
  std::vector<std::pair<std::string, std::string>> attributes;  // extra text attributes
  const GrdItem* ancillary = nullptr;  // named in ancillary_variables
};

struct GrdCustomBlock {
  std::string name;
  std::vector<float> values;
  GrdCustomBlock* next = nullptr;
};

struct GrdFile {
  GrdHeader* header = nullptr;
  int ncid = -1;
  bool forWriting = false;
  // reading: the next time step that grdReadItemTimeStep gives
  std::size_t nextStep = 0;
  // writing
  std::string finalName;
  int itemVar = -1;
  std::vector<int> itemVars;          // every item's variable, item 1 first
  std::vector<std::size_t> itemSteps;  // time steps written of each item
  int timeVar = -1;
  bool hasTime = false;
  std::size_t stepsWritten = 0;
  bool failed = false;
  // The item variables' names, item 1 first.
  std::vector<std::string> itemNames;
  // Set from the first value written on: the file's image, laid out and
  // closed by NetCDF, taking the values chunk by chunk (ncid is then -1).
  std::unique_ptr<ChunkWriter> chunks;
};

struct GrdHeader {
  bool reading = false;
  std::vector<std::unique_ptr<GrdItem>> items;
  std::vector<std::unique_ptr<GrdCustomBlock>> blocks;  // chained in file order

  // reading: the open file, closed with the header
  std::unique_ptr<GrdFile> readFile;

  // writing
  GrdFile* writeFile = nullptr;  // created by grdFileCreate, released by close/abandon
  std::string fileName;
  std::string title;
  float deleteFloat = kGrdDefaultDelete;
  double deleteDouble = -1e-30;
  int dataType = 0;
  bool timeAxis = false;
  int timeUnit = 0;
  double timeStart = 0.0;
  double timeStep = 1.0;
  int firstStep = 0;
  bool geoSet = false;
  std::string projection;
  double longitude = 0.0;
  double latitude = 0.0;
  double orientation = 0.0;
  bool georeferenced = false;
  GrdGeoreference georeference;
  int compressionThreads = 1;
};

// Chains the blocks of a header in order (after a block was added).
void grdLinkBlocks(GrdHeader& header);

// Discards a file being written: nothing of it reaches the disk.
void grdDiscardWriteFile(GrdHeader& header);

// Calls use with the projected CRS that a projection text names (UTM-<zone>,
// EPSG:<code>, PROJ string, WKT); false, without calling it, when there is none
// (LOCAL) or PROJ does not know it.
bool grdWithProjectedCrs(const std::string& projection,
                         const std::function<void(PJ_CONTEXT*, PJ*)>& use);

// WKT of the projected CRS that a projection text names, empty when there is
// none (LOCAL) or PROJ does not know it.
std::string grdProjectionWkt(const std::string& projection);

// One attribute of a CF grid mapping: a text or numbers.
struct GrdCfAttribute {
  std::string name;
  std::string text;
  std::vector<double> numbers;
};

// The CF grid_mapping_name and parameters of the CRS a projection text names
// (transverse_mercator, lambert_conformal_conic, mercator, polar_stereographic,
// albers_conical_equal_area, with the ellipsoid); empty when the CRS is none
// of these or there is none (LOCAL).
std::vector<GrdCfAttribute> grdCfGridMapping(const std::string& projection);

// WKT of the projected CRS in the form GDAL writes as spatial_ref (WKT 1),
// WKT 2 where WKT 1 cannot express it; empty as grdProjectionWkt.
std::string grdProjectionSpatialRef(const std::string& projection);

// Puts size bytes under finalName so that the name either keeps its earlier
// file or holds the complete new one. false (and errno-style text in error)
// when it could not; nothing is left behind then.
bool grdCommitFile(const std::string& finalName, const void* bytes, std::size_t size,
                   std::string* error);

// Checks that a file could be created under finalName (its directory is
// writable and the name is not a directory); grdCreateProblem says why not.
bool grdCanCreate(const std::string& finalName);

}  // namespace karnet

#endif  // KARNET_GRIDFILE_GRID_FILE_INTERNAL_H_
