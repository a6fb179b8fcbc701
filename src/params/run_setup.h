#ifndef KARNET_PARAMS_RUN_SETUP_H_
#define KARNET_PARAMS_RUN_SETUP_H_

#include <cstddef>
#include <string>

namespace karnet {

struct FileDescription;
struct RunParameters;
struct RunSettings;

// The settings that come from the parameters and the bathymetry header (all
// but the map origin, which needs the map projection).
void deriveSettings(const RunParameters& parameters, const FileDescription& bathymetry,
                    RunSettings& settings);

// True when both names lead to one existing file (also through links).
bool sameExistingFile(const char* a, const char* b);

// True when the run's log file (the parameter file's name with .log) is one
// of its inputs as the parameters name them: the bathymetry or the data file.
// Such a file must not be emptied for the log. (A parameter file that would
// be its own log is refused before it is read.)
bool logIsOwnInput(const RunParameters& parameters, const char* parameterFile);

// True when the result file's name leads to one of the run's own files (an
// input, the parameter file or its log): writing the result would destroy it.
bool resultIsOwnFile(const RunParameters& parameters, const char* parameterFile);

// The lines "karnet: FILE: REASON" for the standard error stream that name each
// input that stops the run: one that is no readable regular file, or a
// bathymetry that could not be read (bathymetryProblem; empty when it was).
std::string inputProblemNotices(const RunParameters& parameters,
                                const std::string& bathymetryProblem);

// 1 when every rule holds; otherwise 0 with the message in buffer.
int checkRunSettings(const RunParameters& parameters, const RunSettings& settings, char* buffer,
                     std::size_t size);

}  // namespace karnet

#endif  // KARNET_PARAMS_RUN_SETUP_H_
