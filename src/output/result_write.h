#ifndef KARNET_OUTPUT_RESULT_WRITE_H_
#define KARNET_OUTPUT_RESULT_WRITE_H_

#include <cstdint>
#include <functional>
#include <string>

#include "output/result_attributes.h"

namespace karnet {

struct FileDescription;
struct FloatGrid3D;

// Writes the local result grid as a 3-D gridded file with one item of the given
// type, the description's axes, custom block and geographic information, and
// (with writeValues) one time step of values. The file is georeferenced: z
// holds depths below the surface; x and y projection coordinates (a grid
// parallel to the projection's axes) or distances along the grid's axes (a
// turned grid); lon and lat every node's position (not for LOCAL); crs the CF
// grid mapping. globalAttributes (title, history, ...) are added when given.
// With errorValues (the objective analysis' error field, same shape as values)
// the file gets a second item "<item>_error" that item 1 names as its
// ancillary variable. threads compress the values (the bytes do not depend on
// their number). 1 when the file was written and closed, 0 on any
// failure; a failed write leaves no file under fileName and keeps an earlier
// file of that name; reason, when given, then says why.
int resultWrite(const char* fileName, const FileDescription& description, int writeValues,
                std::int32_t itemType, const FloatGrid3D& values, const char* projection,
                const TextAttributes* globalAttributes = nullptr,
                const FloatGrid3D* errorValues = nullptr, std::string* reason = nullptr,
                int threads = 1);

// Hands over local level s (0 for the first level of the result) of the
// result grid: nx * ny floats, x fastest, into buffer; false when it cannot.
using ResultLevelSource = std::function<bool(std::int32_t s, float* buffer)>;

// The same file, its values taken level by level from `levels`, first level
// first, so that the whole grid never needs to be in one place.
// errorLevels, when given, are the error field's levels, written as item 2.
int resultWriteLevels(const char* fileName, const FileDescription& description,
                      std::int32_t itemType, const ResultLevelSource& levels,
                      const char* projection, const TextAttributes* globalAttributes = nullptr,
                      const ResultLevelSource* errorLevels = nullptr,
                      std::string* reason = nullptr, int threads = 1);

}  // namespace karnet

#endif  // KARNET_OUTPUT_RESULT_WRITE_H_
