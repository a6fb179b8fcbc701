#include "params/run_setup.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <string>

#include "control/command_line.h"
#include "params/run_parameters.h"
#include "params/run_settings.h"
#include "support/date_time.h"
#include "support/file_check.h"
#include "support/file_description.h"

namespace karnet {
namespace {

void copyText(char* destination, std::size_t size, const char* source) {
  const std::size_t n = strnlen(source, size - 1);
  std::memcpy(destination, source, n);
  destination[n] = '\0';
}

// Inputs must be readable regular files: a FIFO or a device would block the run
// or never end.
bool readable(const char* path) { return inputFileProblem(path).empty(); }

}  // namespace

bool sameExistingFile(const char* a, const char* b) {
  struct stat first, second;
  return a[0] != '\0' && b[0] != '\0' && ::stat(a, &first) == 0 && ::stat(b, &second) == 0 &&
         first.st_dev == second.st_dev && first.st_ino == second.st_ino;
}

bool logIsOwnInput(const RunParameters& parameters, const char* parameterFile) {
  char logFileName[kFileNameSize];
  if (makeLogFileName(parameterFile, logFileName) == 0) return false;
  return sameExistingFile(logFileName, parameters.inputFiles.FileName) ||
         sameExistingFile(logFileName, parameters.inputFiles.DataFileName);
}

bool resultIsOwnFile(const RunParameters& parameters, const char* parameterFile) {
  const char* result = parameters.outputData.FileName;
  char logFileName[kFileNameSize];
  const bool hasLog = makeLogFileName(parameterFile, logFileName) != 0;
  return sameExistingFile(result, parameters.inputFiles.FileName) ||
         sameExistingFile(result, parameters.inputFiles.DataFileName) ||
         sameExistingFile(result, parameterFile) ||
         (hasLog && sameExistingFile(result, logFileName));
}

void deriveSettings(const RunParameters& p, const FileDescription& bathymetry, RunSettings& s) {
  s.j0 = static_cast<std::int32_t>(bathymetry.axes[1].start);
  s.jx = s.j0 + bathymetry.axes[1].lastIndex;
  s.k0 = static_cast<std::int32_t>(bathymetry.axes[2].start);
  s.kx = s.k0 + bathymetry.axes[2].lastIndex;
  s.l0 = p.gridDescription.ZRange[0];
  s.lx = p.gridDescription.ZRange[1];
  s.dx = bathymetry.axes[1].spacing;
  s.dy = bathymetry.axes[2].spacing;
  s.dz = p.gridDescription.Spacing;
  s.orientation = bathymetry.misc[0];
  s.landValue = bathymetry.misc[3];
  s.startDateTime = DateTime{};
  s.SearchRadius = p.calculationParameters.SearchRadius;
  s.MaxExtrapolationDistance[0] = p.calculationParameters.MaxExtrapolationDistance[0];
  s.MaxExtrapolationDistance[1] = p.calculationParameters.MaxExtrapolationDistance[1];
  s.Analysis = p.calculationParameters.Analysis;
  const ObjectiveAnalysisParameters& oa = p.objectiveAnalysisParameters;
  s.FilterType = oa.FilterType;
  s.FilterOperations = oa.FilterOperations;
  s.CorrelationSampleSize = oa.CorrelationSampleSize;
  s.ZeroCrossingDistance = oa.ZeroCrossingDistance;
  s.DecayDistance = oa.DecayDistance;
  s.ErrorVariance = oa.ErrorVariance;
  s.MaxData = oa.MaxData;
  s.MinData = oa.MinData;
  copyText(s.dataFileName, sizeof s.dataFileName, p.inputFiles.DataFileName);
  copyText(s.projection, sizeof s.projection, p.inputFiles.Projection);
}

namespace {

bool calculationParametersValid(const RunSettings& s) {
  if (0 > s.SearchRadius) return false;
  if (0 > s.MaxExtrapolationDistance[0] || 0 > s.MaxExtrapolationDistance[1]) return false;
  if (0 > s.ZeroCrossingDistance || 0 > s.DecayDistance) return false;
  if (0 > s.ErrorVariance || s.ErrorVariance > 100.0) return false;
  if (s.CorrelationSampleSize < 1) return false;
  // The correlation model divides by both distances: with a zero every estimate
  // of the objective analysis would come out not-a-number.
  if (s.Analysis == 0 && !(s.DecayDistance > 0 && s.ZeroCrossingDistance > 0)) return false;
  return true;
}

}  // namespace

std::string inputProblemNotices(const RunParameters& parameters,
                                const std::string& bathymetryProblem) {
  const char* bathymetry = parameters.inputFiles.FileName;
  const char* observations = parameters.inputFiles.DataFileName;
  std::string notices;
  std::string problem = inputFileProblem(bathymetry);
  if (problem.empty()) problem = bathymetryProblem;
  if (!problem.empty()) notices += fileNotice(bathymetry, problem);
  problem = inputFileProblem(observations);
  if (!problem.empty()) notices += fileNotice(observations, problem);
  return notices;
}

int checkRunSettings(const RunParameters& parameters, const RunSettings& s, char* buffer,
                     std::size_t size) {
  if (!readable(parameters.inputFiles.FileName) || !readable(parameters.inputFiles.DataFileName)) {
    std::snprintf(buffer, size, "ERROR: in input file selection");
    return 0;
  }
  if (!(s.j0 <= s.jx) || !(s.k0 <= s.kx)) {
    std::snprintf(buffer, size, "j0 = %d jx = %d k0 = %d kx = %d", s.j0, s.jx, s.k0, s.kx);
    return 0;
  }
  // A reversed level range would give a local grid with no levels.
  if (!(s.l0 <= s.lx)) {
    std::snprintf(buffer, size, "l0 = %d lx = %d", s.l0, s.lx);
    return 0;
  }
  // Node distances divide positions later: zero is as unusable as negative.
  if (!(s.dx > 0) || !(s.dy > 0)) {
    std::snprintf(buffer, size, "dx = %f dy = %f", static_cast<double>(s.dx),
                  static_cast<double>(s.dy));
    return 0;
  }
  if (!(s.dz > 0)) {
    std::snprintf(buffer, size, "dz = %f", static_cast<double>(s.dz));
    return 0;
  }
  char text[80];
  DateTime parsed;
  dateTimeFormat(text, sizeof text, s.startDateTime);
  if (dateTimeParse(parsed, text) == 0) {
    std::snprintf(buffer, size, "ERROR: in physical description");
    return 0;
  }
  if (!calculationParametersValid(s)) {
    std::snprintf(buffer, size, "ERROR: in calculation parameters");
    return 0;
  }
  return 1;
}

}  // namespace karnet
