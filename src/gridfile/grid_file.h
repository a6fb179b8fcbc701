#ifndef KARNET_GRIDFILE_GRID_FILE_H_
#define KARNET_GRIDFILE_GRID_FILE_H_

// Gridded data files (NetCDF). Every call returns 0 for success and non-zero for
// failure and never throws. Items are numbered from 1.

#include <cstdint>
#include <functional>
#include <string>
#include <utility>
#include <vector>

namespace karnet {

struct GrdHeader;       // what is known about a file: items, axes, crs, custom blocks
struct GrdFile;         // an open file
struct GrdItem;         // one item (data variable) of a header
struct GrdCustomBlock;  // one float global attribute

int grdInitSystem();

// ---- reading ----
// reason, when given, says why a file could not be opened ("not a regular file", ...).
int grdFileRead(const char* fileName, GrdHeader** header, GrdFile** file,
                std::string* reason = nullptr);
int grdGetNoOfItems(GrdHeader* header);
GrdItem* grdItemD(GrdHeader* header, int itemNumber);  // null when there is no such item
int grdSetItemUnitConversion(GrdItem* item, int a, int b);  // converts nothing
// 5: two equidistant spatial axes; 10: three; 0: anything else.
int grdGetItemAxisType(GrdItem* item);
int grdGetItemAxisEqD2(GrdItem* item, std::int32_t* jStart, std::int32_t* kStart,
                       std::int32_t* nx, std::int32_t* ny, double* xOrigin, double* yOrigin,
                       float* dx, float* dy);
int grdGetGeoInfoUTMProj(GrdHeader* header, std::string* projection, double* longitude,
                         double* latitude, double* orientation);
int grdGetCustomBlockRef(GrdHeader* header, GrdCustomBlock** first);
// type (1), name, number of values, values (owned by the header), next block (null at the end).
int grdGetCustomBlock(GrdCustomBlock* block, std::int32_t* type, const char** name,
                      std::int32_t* count, const float** values, GrdCustomBlock** next);
// Minimum and maximum of the item over all values that differ from its delete value;
// both are the delete value when there is none. third may be null.
int grdGetItemStatsGlobal(GrdItem* item, double* minimum, double* maximum, double* third);
int grdFindBlockDynamic(GrdHeader* header, GrdFile* file);
// Reads the next time step of item 1 into data (nx*ny[*nz] floats, x fastest).
int grdReadItemTimeStep(GrdHeader* header, GrdFile* file, double* time, float* data);
// grdGetItemStatsGlobal of the first item, then grdFindBlockDynamic and
// grdReadItemTimeStep; an item of one time step is read only once, its
// statistics taken from the values read (the same values in the same order).
int grdReadItemStatsAndFirstStep(GrdHeader* header, GrdFile* file, double* minimum,
                                 double* maximum, double* time, float* data);
// Destroys the header (and closes a file opened for reading with it, or drops
// a file still being written); sets *header to null.
void grdHeaderDestroy(GrdHeader** header);

// ---- writing ----
int grdHeaderCreate(int itemCount, const char* fileName, const char* title, int a, int b, int c,
                    GrdHeader** header);
// Threads that compress the values of the file being written (default 1); the
// file's bytes do not depend on it.
int grdSetCompressionThreads(GrdHeader* header, int threads);
int grdSetDeleteValFloat(GrdHeader* header, float value);
int grdSetDeleteValDouble(GrdHeader* header, double value);
int grdSetDataType(GrdHeader* header, int dataType);
int grdSetEqTimeAxis(GrdHeader* header, int unit, double start, double step, int firstStep);
int grdSetItemInfo(GrdHeader* header, GrdItem* item, std::int32_t itemType, const char* key,
                   std::int32_t unit, int flag);
// Extra text attributes of an item, written after those grdSetItemInfo gives
// it; a name it already has (long_name, units) is replaced.
int grdSetItemAttribute(GrdItem* item, const char* name, const char* text);
// Names item `ancillary` (of the same header) in the item's CF
// ancillary_variables attribute.
int grdSetItemAncillary(GrdItem* item, GrdItem* ancillary);
int grdSetItemAxisEqD3(GrdItem* item, int axisUnit, std::int32_t nx, std::int32_t ny,
                       std::int32_t nz, float x0, float y0, float z0, float dx, float dy,
                       float dz);
// The 2-D form (an item on y and x only, as in a bathymetry file).
int grdSetItemAxisEqD2(GrdItem* item, int axisUnit, std::int32_t nx, std::int32_t ny, float x0,
                       float y0, float dx, float dy);
int grdAddCustomBlock(GrdHeader* header, int type, const char* name, std::int32_t count,
                      const float* values);
int grdSetGeoInfoUTMProj(GrdHeader* header, const char* projection, double longitude,
                         double latitude, double orientation);
// The georeferenced layout of a 3-D result file, set before grdFileCreate (a
// header without it writes the plain layout: coordinates are distances from
// the origin node, z counts upwards from the first level).
struct GrdGeoreference {
  // z holds depths below the surface: firstDepth at the first level, then
  // falling by the z spacing.
  double firstDepth = 0.0;
  // The first node's x and y coordinate values.
  double xFirst = 0.0;
  double yFirst = 0.0;
  // x and y are projection coordinates (with their CF standard names);
  // otherwise distances along the grid's own axes.
  bool projectedXY = false;
  // The item names "crs" as its grid_mapping.
  bool itemGridMapping = true;
  // Longitude and latitude (degrees) of the nodes of row y (nx of each); when
  // set, the file gets lon(y, x) and lat(y, x) and the item coordinates
  // "lon lat". false from it fails the file's creation. It is called once for
  // each row, in any order, from as many threads at once as the header's
  // compression threads.
  std::function<bool(std::int32_t y, double* lon, double* lat)> rowGeolocation;
  // Global text attributes (title, history, ...), in order; empty texts are left out.
  std::vector<std::pair<std::string, std::string>> globalAttributes;
};
int grdSetGeoreference(GrdHeader* header, const GrdGeoreference& georeference);

// Creates the file once every item has its info and axis. Its contents are
// assembled in memory: nothing appears under fileName before grdFileClose, and
// an earlier file of that name stays as it is until then. Without
// grdSetEqTimeAxis the file has no time dimension and takes one step.
int grdFileCreate(const char* fileName, GrdHeader* header, GrdFile** file);
int grdWriteItemTimeStep(GrdHeader* header, GrdFile* file, double time, const float* data);
// Writes the next time step of item itemNumber (from 1; item 1 as above).
int grdWriteItemNTimeStep(GrdHeader* header, GrdFile* file, int itemNumber, double time,
                          const float* data);
// The same time step level by level: grdWriteItemLevel stores z level `level`
// (x fastest, then y) of the step of item itemNumber being written, in any
// order, and grdFinishItemTimeStep then sets the step's time and closes it.
int grdWriteItemLevel(GrdHeader* header, GrdFile* file, std::int32_t level, const float* data,
                      int itemNumber = 1);
// The same for levelCount consecutive levels from firstLevel (levelCount * nx * ny
// floats), their chunks compressed at once.
int grdWriteItemLevels(GrdHeader* header, GrdFile* file, std::int32_t firstLevel,
                       std::int32_t levelCount, const float* data, int itemNumber = 1);
int grdFinishItemTimeStep(GrdHeader* header, GrdFile* file, double time, int itemNumber = 1);
// Closes the file; a complete file is renamed to its final name. Sets *file to null.
// reason, when given, says why the file could not be put in place.
int grdFileClose(GrdHeader* header, GrdFile** file, std::string* reason = nullptr);
// Why no file can be created under fileName (its directory is missing or not
// writable, or the name is a directory); empty when one can.
std::string grdCreateProblem(const std::string& fileName);
// Drops a file that was created but must not appear; nothing of it reaches the disk.
int grdFileAbandon(GrdHeader* header, GrdFile** file);

// Removes any temporary file that a close is about to rename. Safe to call
// from a signal handler; also run at exit.
void grdRemoveTemporaryFiles();

}  // namespace karnet

#endif  // KARNET_GRIDFILE_GRID_FILE_H_
