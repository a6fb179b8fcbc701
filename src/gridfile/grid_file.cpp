// Calls shared by reading and writing: items, unit conversion, header release.
#include <netcdf.h>

#include "gridfile/grid_file.h"
#include "gridfile/grid_file_internal.h"

namespace karnet {

int grdInitSystem() { return 0; }

int grdGetNoOfItems(GrdHeader* header) {
  if (header == nullptr) return 0;
  return static_cast<int>(header->items.size());
}

GrdItem* grdItemD(GrdHeader* header, int itemNumber) {
  if (header == nullptr || itemNumber < 1) return nullptr;
  if (static_cast<std::size_t>(itemNumber) > header->items.size()) return nullptr;
  return header->items[static_cast<std::size_t>(itemNumber) - 1].get();
}

// Values are never converted between units: every argument pair is accepted.
int grdSetItemUnitConversion(GrdItem* item, int, int) { return item != nullptr ? 0 : 1; }

void grdLinkBlocks(GrdHeader& header) {
  for (std::size_t i = 0; i < header.blocks.size(); ++i) {
    header.blocks[i]->next = i + 1 < header.blocks.size() ? header.blocks[i + 1].get() : nullptr;
  }
}

void grdHeaderDestroy(GrdHeader** header) {
  if (header == nullptr || *header == nullptr) return;
  GrdHeader* h = *header;
  if (h->readFile && h->readFile->ncid >= 0) nc_close(h->readFile->ncid);
  // A file still being written when its header goes never appears.
  if (h->writeFile != nullptr) grdDiscardWriteFile(*h);
  delete h;
  *header = nullptr;
}

}  // namespace karnet
