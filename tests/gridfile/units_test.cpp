// The item-type table: unknown types and codes, against a known one.
#include <gtest/gtest.h>

#include <string>

#include "gridfile/units.h"

namespace karnet {
namespace {

TEST(UnitTable, UnknownTypesAndCodes) {
  for (const std::int32_t type : {0, 11, -1, 1000}) {
    std::string key = "stale";
    std::int32_t unit = -5;
    EXPECT_NE(unitGetItemTypeKey(type, &key), 0) << type;
    EXPECT_EQ(key, "");
    EXPECT_NE(unitGetItemUserUnit(type, &unit), 0) << type;
    EXPECT_EQ(unit, 0);
    EXPECT_STREQ(unitCfStandardName(type), "");
  }
  EXPECT_STREQ(unitCfUnits(0), "1");
  // A known type for contrast: key, its own code, CF units and standard name.
  std::string key;
  std::int32_t unit = 0;
  EXPECT_EQ(unitGetItemTypeKey(5, &key), 0);
  EXPECT_EQ(key, "Oxygen");
  EXPECT_EQ(unitGetItemUserUnit(5, &unit), 0);
  EXPECT_STREQ(unitCfUnits(unit), "umol kg-1");
  EXPECT_STREQ(unitCfStandardName(5), "moles_of_oxygen_per_unit_mass_in_sea_water");
  EXPECT_STREQ(unitCfUnits(1000), "m");
  EXPECT_NE(unitGetItemTypeKey(2, nullptr), 0);
}

}  // namespace
}  // namespace karnet
