// What made a result file, as CF global attributes.
#include "output/result_attributes.h"

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <string>

#include "params/run_parameters.h"

namespace karnet {
namespace {

// Shortest text that reads back as the same 32-bit float.
std::string number(float value) {
  char text[32];
  for (int digits = 6; digits <= 9; ++digits) {
    std::snprintf(text, sizeof text, "%.*g", digits, static_cast<double>(value));
    if (std::strtof(text, nullptr) == value) break;
  }
  return text;
}

std::string isoTime(std::time_t when) {
  std::tm parts{};
  if (gmtime_r(&when, &parts) == nullptr) return "unknown time";
  char text[32];
  std::strftime(text, sizeof text, "%Y-%m-%dT%H:%M:%SZ", &parts);
  return text;
}

std::string methodParameters(const RunParameters& p) {
  const CalculationParameters& c = p.calculationParameters;
  const ObjectiveAnalysisParameters& o = p.objectiveAnalysisParameters;
  std::string text = "SearchRadius = " + number(c.SearchRadius) +
                     " m; MaxExtrapolationDistance = " + number(c.MaxExtrapolationDistance[0]) +
                     ", " + number(c.MaxExtrapolationDistance[1]) + " m";
  if (c.Analysis == 0) {
    text += "; ZeroCrossingDistance = " + number(o.ZeroCrossingDistance) +
            " m; DecayDistance = " + number(o.DecayDistance) +
            " m; ErrorVariance = " + number(o.ErrorVariance) + "; MinData = " +
            number(o.MinData) + "; MaxData = " + number(o.MaxData) +
            "; CorrelationSampleSize = " + std::to_string(o.CorrelationSampleSize) +
            "; FilterType = " + (o.FilterType == 1 ? "12 pts filter" : "Shapiro");
  }
  text += "; FilterOperations = " + std::to_string(o.FilterOperations);
  text += "; ZRange = " + std::to_string(p.gridDescription.ZRange[0]) + ", " +
          std::to_string(p.gridDescription.ZRange[1]) +
          "; Spacing = " + number(p.gridDescription.Spacing) + " m";
  return text;
}

}  // namespace

TextAttributes resultGlobalAttributes(const RunParameters& p, const std::string& commandLine,
                                      const std::string& version, std::time_t when) {
  const bool bilinear = p.calculationParameters.Analysis != 0;
  return {
      {"title", p.outputData.Title},
      {"history", isoTime(when) + ": " + commandLine},
      {"source", "karnet " + version},
      {"method", bilinear ? "bilinear / distance-weighted interpolation"
                          : "objective analysis (optimal interpolation)"},
      {"method_parameters", methodParameters(p)},
      {"input_observations", p.inputFiles.DataFileName},
      {"input_bathymetry", p.inputFiles.FileName},
  };
}

std::time_t resultTimestamp() {
  if (const char* epoch = std::getenv("SOURCE_DATE_EPOCH")) {
    char* end = nullptr;
    errno = 0;
    const long long seconds = std::strtoll(epoch, &end, 10);
    if (end != epoch && *end == '\0' && errno == 0 && seconds >= 0) {
      return static_cast<std::time_t>(seconds);
    }
  }
  return std::time(nullptr);
}

}  // namespace karnet
