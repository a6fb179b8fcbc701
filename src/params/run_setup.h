#ifndef KARNET_PARAMS_RUN_SETUP_H_
#define KARNET_PARAMS_RUN_SETUP_H_

#include <cstddef>

namespace karnet {

struct FileDescription;
struct RunParameters;
struct RunSettings;

// The settings that come from the parameters and the bathymetry header (all
// but the map origin, which needs the map projection).
void deriveSettings(const RunParameters& parameters, const FileDescription& bathymetry,
                    RunSettings& settings);

// True when the result file's name leads to one of the run's own files (an
// input, the parameter file or its log): writing the result would destroy it.
bool resultIsOwnFile(const RunParameters& parameters, const char* parameterFile);

// 1 when every rule holds; otherwise 0 with the message in buffer.
int checkRunSettings(const RunParameters& parameters, const RunSettings& settings, char* buffer,
                     std::size_t size);

}  // namespace karnet

#endif  // KARNET_PARAMS_RUN_SETUP_H_
