#ifndef KARNET_OUTPUT_RESULT_ATTRIBUTES_H_
#define KARNET_OUTPUT_RESULT_ATTRIBUTES_H_

#include <ctime>
#include <string>
#include <utility>
#include <vector>

namespace karnet {

struct RunParameters;

using TextAttributes = std::vector<std::pair<std::string, std::string>>;

// The global attributes that say what made a result: title (the run's Title),
// history ("DATE: COMMAND LINE", DATE in UTC, ISO 8601), source (program and
// version), method and method_parameters, input_observations and
// input_bathymetry.
TextAttributes resultGlobalAttributes(const RunParameters& parameters,
                                      const std::string& commandLine,
                                      const std::string& version, std::time_t when);

// The time a result records as made: SOURCE_DATE_EPOCH (seconds since 1970)
// when that is set to a number, so that repeated runs give the same bytes,
// else now.
std::time_t resultTimestamp();

}  // namespace karnet

#endif  // KARNET_OUTPUT_RESULT_ATTRIBUTES_H_
