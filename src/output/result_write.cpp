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

}  // namespace

namespace {

// Writes the file; with a level source, its levels in increasing order.
int writeResult(const char* fileName, const FileDescription& description,
                std::int32_t itemType, const ResultLevelSource* levels, const char* projection,
                const TextAttributes* globalAttributes) {
  grdInitSystem();
  GrdHeader* header = nullptr;
  if (grdHeaderCreate(1, fileName, "", 1, 1, 2, &header) != 0) {
    grdHeaderDestroy(&header);
    return 0;
  }
  GrdFile* file = nullptr;
  if (describeResult(header, description, itemType, projection, globalAttributes) != 0 ||
      grdFileCreate(fileName, header, &file) != 0) {
    grdHeaderDestroy(&header);
    return 0;
  }
  if (levels != nullptr) {
    const std::int64_t nx = description.axes[1].lastIndex + 1;
    const std::int64_t ny = description.axes[2].lastIndex + 1;
    const std::int32_t nz = description.axes[3].lastIndex + 1;
    std::vector<float> buffer(static_cast<std::size_t>(nx * ny));
    bool written = true;
    for (std::int32_t s = 0; s < nz && written; ++s) {
      written = (*levels)(s, buffer.data()) &&
                grdWriteItemLevel(header, file, s, buffer.data()) == 0;
    }
    if (!written || grdFinishItemTimeStep(header, file, 0.0) != 0) {
      grdFileAbandon(header, &file);
      grdHeaderDestroy(&header);
      return 0;
    }
  }
  const int closed = grdFileClose(header, &file);
  grdHeaderDestroy(&header);
  return closed == 0 ? 1 : 0;
}

}  // namespace

int resultWrite(const char* fileName, const FileDescription& description, int writeValues,
                std::int32_t itemType, const FloatGrid3D& values, const char* projection,
                const TextAttributes* globalAttributes) {
  if (writeValues == 0) {
    return writeResult(fileName, description, itemType, nullptr, projection, globalAttributes);
  }
  // The values go level by level, as in a run over several processes, so that
  // both give the same bytes.
  const std::int64_t layer = values.layerSize();
  const std::int64_t described = std::int64_t{description.axes[1].lastIndex + 1} *
                                 (description.axes[2].lastIndex + 1);
  const ResultLevelSource fromGrid = [&values, layer, described](std::int32_t s, float* buffer) {
    if (values.data == nullptr || layer != described || s < 0 || s >= values.nl) return false;
    std::copy(values.data + s * layer, values.data + (s + 1) * layer, buffer);
    return true;
  };
  return writeResult(fileName, description, itemType, &fromGrid, projection, globalAttributes);
}

int resultWriteLevels(const char* fileName, const FileDescription& description,
                      std::int32_t itemType, const ResultLevelSource& levels,
                      const char* projection, const TextAttributes* globalAttributes) {
  return writeResult(fileName, description, itemType, &levels, projection, globalAttributes);
}

}  // namespace karnet
