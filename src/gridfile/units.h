#ifndef KARNET_GRIDFILE_UNITS_H_
#define KARNET_GRIDFILE_UNITS_H_

#include <cstdint>
#include <string>

namespace karnet {

// Item types and their units (key text, unit code, CF units and standard name).
// 0 and the key text, or non-zero and an empty text for an unknown type.
int unitGetItemTypeKey(std::int32_t itemType, std::string* key);
// 0 and the unit code; unknown types give code 0 and a non-zero result.
int unitGetItemUserUnit(std::int32_t itemType, std::int32_t* unit);
// CF "units" text of a unit code ("m" for the metre, 1000; "1" for an unknown code).
const char* unitCfUnits(std::int32_t unitCode);
// CF standard_name of an item type, empty when there is none.
const char* unitCfStandardName(std::int32_t itemType);

}  // namespace karnet

#endif  // KARNET_GRIDFILE_UNITS_H_
