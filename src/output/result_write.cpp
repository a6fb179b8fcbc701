#include "output/result_write.h"

#include <algorithm>
#include <string>
#include <vector>

#include "gridfile/grid_file.h"
#include "gridfile/units.h"
#include "output/result_coordinates.h"
#include "support/file_description.h"
#include "support/float_grid.h"

namespace karnet {
namespace {

// Item type "Undefined": no standard name, dimensionless.
constexpr std::int32_t kUnitlessItemType = 1;

constexpr char kErrorComment[] =
    "ordinary-kriging error variance of the objective-analysis estimate relative to the "
    "signal variance, 1 - r'A^-1 r + (1 - 1'A^-1 r)^2 / (1'A^-1 1), clipped to [0, 1]; "
    "r: correlations of the node with the data cells used, A: their correlation matrix with "
    "the error variance on its diagonal; before smoothing and clipping of the estimate; "
    "fill value where the node got no estimate";

// Every header call up to the file's creation; the first failure stops them.
int describeResult(GrdHeader* header, const FileDescription& d, std::int32_t itemType,
                   const char* projection, const TextAttributes* attributes) {
  if (grdSetDeleteValFloat(header, kDeleteValueFloat) != 0) return 1;
  if (grdSetDeleteValDouble(header, kDeleteValueDouble) != 0) return 1;
  if (grdSetDataType(header, 0) != 0) return 1;
  if (grdSetEqTimeAxis(header, 0, 0.0, 1.0, 0) != 0) return 1;
  std::string key;
  std::int32_t unit = 0;
  unitGetItemTypeKey(itemType, &key);
  unitGetItemUserUnit(itemType, &unit);
  GrdItem* item = grdItemD(header, 1);
  if (item == nullptr) return 1;
  if (grdSetItemInfo(header, item, itemType, key.c_str(), unit, 1) != 0) return 1;
  if (grdSetItemUnitConversion(item, 3, 0) != 0) return 1;
  if (grdSetItemAxisEqD3(item, 1000, d.axes[1].lastIndex + 1, d.axes[2].lastIndex + 1,
                         d.axes[3].lastIndex + 1, 0.0f, 0.0f, 0.0f, d.axes[1].spacing,
                         d.axes[2].spacing, d.axes[3].spacing) != 0) {
    return 1;
  }
  float misc[7];
  for (int i = 0; i < 7; ++i) misc[i] = static_cast<float>(d.misc[i]);
  if (grdAddCustomBlock(header, 1, "Q84_Misc", 7, misc) != 0) return 1;
  if (grdSetGeoInfoUTMProj(header, projection, d.axes[1].origin, d.axes[2].origin, d.misc[0]) !=
      0) {
    return 1;
  }
  GrdGeoreference georeference;
  if (!resultGeoreference(d, projection != nullptr ? projection : "", &georeference)) return 1;
  if (attributes != nullptr) georeference.globalAttributes = *attributes;
  return grdSetGeoreference(header, georeference);
}

// The error field as item 2: named after item 1 with "_error", unitless,
// linked from item 1 as its ancillary variable.
int describeErrorItem(GrdHeader* header, const FileDescription& d, std::int32_t itemType) {
  std::string key;
  unitGetItemTypeKey(itemType, &key);
  if (key.empty()) key = std::string("item_").append(std::to_string(itemType));
  const std::string name = key + "_error";
  const std::string longName = "relative error variance of the " + key + " estimate";
  GrdItem* item = grdItemD(header, 1);
  GrdItem* error = grdItemD(header, 2);
  if (item == nullptr || error == nullptr) return 1;
  if (grdSetItemInfo(header, error, kUnitlessItemType, name.c_str(), 0, 1) != 0) return 1;
  if (grdSetItemUnitConversion(error, 3, 0) != 0) return 1;
  if (grdSetItemAxisEqD3(error, 1000, d.axes[1].lastIndex + 1, d.axes[2].lastIndex + 1,
                         d.axes[3].lastIndex + 1, 0.0f, 0.0f, 0.0f, d.axes[1].spacing,
                         d.axes[2].spacing, d.axes[3].spacing) != 0) {
    return 1;
  }
  if (grdSetItemAttribute(error, "long_name", longName.c_str()) != 0 ||
      grdSetItemAttribute(error, "units", "1") != 0 ||
      grdSetItemAttribute(error, "comment", kErrorComment) != 0 ||
      grdSetItemAncillary(item, error) != 0) {
    return 1;
  }
  return 0;
}

}  // namespace

namespace {

// Where the levels of an item come from: a source that hands them over one
// by one, or all of them as they lie one after the other in memory.
struct ItemLevels {
  const ResultLevelSource* source = nullptr;
  const float* whole = nullptr;
  bool present() const { return source != nullptr || whole != nullptr; }
};

// Writes the file; with levels, item 1's levels in increasing order, then
// (when given) the error field's as item 2. Levels held whole go to the file
// in one pass whose chunks are compressed on all threads; levels from a
// source go in batches of one per thread. Both store the same chunks in the
// same order, so the bytes are the same.
int writeResult(const char* fileName, const FileDescription& description,
                std::int32_t itemType, ItemLevels levels, ItemLevels errorLevels,
                const char* projection, const TextAttributes* globalAttributes,
                std::string* reason, int threads) {
  std::string ignored;
  if (reason == nullptr) reason = &ignored;
  grdInitSystem();
  GrdHeader* header = nullptr;
  const bool withErrors = errorLevels.present();
  if (grdHeaderCreate(withErrors ? 2 : 1, fileName, "", 1, 1, 2, &header) != 0) {
    grdHeaderDestroy(&header);
    *reason = "cannot be described";
    return 0;
  }
  GrdFile* file = nullptr;
  if (describeResult(header, description, itemType, projection, globalAttributes) != 0 ||
      (withErrors && describeErrorItem(header, description, itemType) != 0)) {
    grdHeaderDestroy(&header);
    *reason = "its layout cannot be described (axes, projection or attributes)";
    return 0;
  }
  if (grdSetCompressionThreads(header, std::max(threads, 1)) != 0 ||
      grdFileCreate(fileName, header, &file) != 0) {
    grdHeaderDestroy(&header);
    *reason = grdCreateProblem(fileName != nullptr ? fileName : "");
    if (reason->empty()) *reason = "cannot be created";
    return 0;
  }
  if (levels.present()) {
    const std::int64_t nx = description.axes[1].lastIndex + 1;
    const std::int64_t ny = description.axes[2].lastIndex + 1;
    const std::int32_t nz = description.axes[3].lastIndex + 1;
    const std::int32_t batch = std::clamp<std::int32_t>(threads, 1, std::max(nz, 1));
    std::vector<float> buffer;
    bool written = true;
    for (int item = 1; item <= (withErrors ? 2 : 1) && written; ++item) {
      const ItemLevels& from = item == 1 ? levels : errorLevels;
      if (from.whole != nullptr) {
        written = nz < 1 || grdWriteItemLevels(header, file, 0, nz, from.whole, item) == 0;
      } else {
        buffer.resize(static_cast<std::size_t>(nx * ny * batch));
        for (std::int32_t s = 0; s < nz && written; s += batch) {
          const std::int32_t count = std::min(batch, nz - s);
          for (std::int32_t b = 0; b < count && written; ++b) {
            written = (*from.source)(s + b, buffer.data() + b * nx * ny);
          }
          written =
              written && grdWriteItemLevels(header, file, s, count, buffer.data(), item) == 0;
        }
      }
      written = written && grdFinishItemTimeStep(header, file, 0.0, item) == 0;
    }
    if (!written) {
      grdFileAbandon(header, &file);
      grdHeaderDestroy(&header);
      *reason = "its values cannot be written";
      return 0;
    }
  }
  const int closed = grdFileClose(header, &file, reason);
  grdHeaderDestroy(&header);
  return closed == 0 ? 1 : 0;
}

// The levels of a whole local grid, for the writer: as they lie when the grid
// holds every level of the file's layer size, else through a source that
// refuses the levels it lacks.
ItemLevels levelsOf(const FloatGrid3D& values, std::int64_t described, std::int32_t levels,
                    ResultLevelSource& source) {
  if (values.data != nullptr && values.layerSize() == described && values.nl >= levels) {
    return ItemLevels{nullptr, values.data};
  }
  const std::int64_t layer = values.layerSize();
  source = [&values, layer, described](std::int32_t s, float* buffer) {
    if (values.data == nullptr || layer != described || s < 0 || s >= values.nl) return false;
    std::copy(values.data + s * layer, values.data + (s + 1) * layer, buffer);
    return true;
  };
  return ItemLevels{&source, nullptr};
}

}  // namespace

int resultWrite(const char* fileName, const FileDescription& description, int writeValues,
                std::int32_t itemType, const FloatGrid3D& values, const char* projection,
                const TextAttributes* globalAttributes, const FloatGrid3D* errorValues,
                std::string* reason, int threads) {
  const std::int64_t described = std::int64_t{description.axes[1].lastIndex + 1} *
                                 (description.axes[2].lastIndex + 1);
  const std::int32_t nz = description.axes[3].lastIndex + 1;
  ResultLevelSource gridSource, errorSource;
  const ItemLevels fromErrors =
      errorValues != nullptr ? levelsOf(*errorValues, described, nz, errorSource) : ItemLevels{};
  // Without values the error item is still described.
  const ItemLevels fromGrid =
      writeValues != 0 ? levelsOf(values, described, nz, gridSource) : ItemLevels{};
  return writeResult(fileName, description, itemType, fromGrid, fromErrors, projection,
                     globalAttributes, reason, threads);
}

int resultWriteLevels(const char* fileName, const FileDescription& description,
                      std::int32_t itemType, const ResultLevelSource& levels,
                      const char* projection, const TextAttributes* globalAttributes,
                      const ResultLevelSource* errorLevels, std::string* reason,
                      int threads) {
  return writeResult(fileName, description, itemType, ItemLevels{&levels, nullptr},
                     ItemLevels{errorLevels, nullptr}, projection, globalAttributes, reason,
                     threads);
}

}  // namespace karnet
