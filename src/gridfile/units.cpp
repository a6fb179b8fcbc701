// The item types that gridded files know, with their units in CF terms.
#include "gridfile/units.h"

namespace karnet {
namespace {

struct ItemTypeEntry {
  std::int32_t type;
  const char* key;
  std::int32_t unit;
  const char* units;
  const char* standardName;
};

constexpr ItemTypeEntry kItemTypes[] = {
    {1, "Undefined", 1, "1", ""},
    {2, "Temperature", 2, "degree_Celsius", "sea_water_temperature"},
    {3, "Salinity", 3, "1e-3", "sea_water_salinity"},
    {4, "Density", 4, "kg m-3", "sea_water_density"},
    {5, "Oxygen", 5, "umol kg-1", "moles_of_oxygen_per_unit_mass_in_sea_water"},
    {6, "Current speed", 6, "m s-1", "sea_water_speed"},
    {7, "Chlorophyll", 7, "mg m-3", "mass_concentration_of_chlorophyll_in_sea_water"},
    {8, "Sound speed", 8, "m s-1", "speed_of_sound_in_sea_water"},
    {9, "Concentration", 9, "mg l-1", ""},
    {10, "Turbidity", 10, "NTU", "sea_water_turbidity"},
};

// The metre, the unit of every axis and of bathymetry values.
constexpr std::int32_t kMetreCode = 1000;

const ItemTypeEntry* findType(std::int32_t itemType) {
  for (const ItemTypeEntry& entry : kItemTypes) {
    if (entry.type == itemType) return &entry;
  }
  return nullptr;
}

}  // namespace

int unitGetItemTypeKey(std::int32_t itemType, std::string* key) {
  const ItemTypeEntry* entry = findType(itemType);
  if (key != nullptr) *key = entry != nullptr ? entry->key : "";
  return entry != nullptr && key != nullptr ? 0 : 1;
}

int unitGetItemUserUnit(std::int32_t itemType, std::int32_t* unit) {
  const ItemTypeEntry* entry = findType(itemType);
  if (unit != nullptr) *unit = entry != nullptr ? entry->unit : 0;
  return entry != nullptr && unit != nullptr ? 0 : 1;
}

const char* unitCfUnits(std::int32_t unitCode) {
  if (unitCode == kMetreCode) return "m";
  for (const ItemTypeEntry& entry : kItemTypes) {
    if (entry.unit == unitCode) return entry.units;
  }
  return "1";
}

const char* unitCfStandardName(std::int32_t itemType) {
  const ItemTypeEntry* entry = findType(itemType);
  return entry != nullptr ? entry->standardName : "";
}

}  // namespace karnet
