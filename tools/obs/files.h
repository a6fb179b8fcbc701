#ifndef KARNET_TOOLS_OBS_FILES_H_
#define KARNET_TOOLS_OBS_FILES_H_

#include <string>

namespace karnet::obs {

// The projection text of a bathymetry file in karnet's layout (its crs variable's projection).
// Throws ObsError when the file cannot be read or has none.
std::string bathymetryProjection(const std::string& path);

// Writes text to path through a temporary file beside it, renamed once complete: a failure
// leaves no partial file and any earlier file of that name untouched. Throws ObsError.
void writeFileAtomically(const std::string& path, const std::string& text);

}  // namespace karnet::obs

#endif  // KARNET_TOOLS_OBS_FILES_H_
