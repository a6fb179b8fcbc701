#ifndef KARNET_PARAMS_RUN_SETUP_H_
#define KARNET_PARAMS_RUN_SETUP_H_

#include <cstddef>

namespace karnet {

// Reads the parameter file and the bathymetry header, derives runSettings,
// validates them and places the map projection. Returns 1; every failure ends
// the run through fatalError (exit code 1).
int setupRun(const char* parameterFile);

// 1 when every rule holds; otherwise 0 with the message in buffer.
int checkRunSettings(char* buffer, std::size_t size);

}  // namespace karnet

#endif  // KARNET_PARAMS_RUN_SETUP_H_
