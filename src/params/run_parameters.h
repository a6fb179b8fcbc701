#ifndef KARNET_PARAMS_RUN_PARAMETERS_H_
#define KARNET_PARAMS_RUN_PARAMETERS_H_

#include <cstdint>

namespace karnet {

inline constexpr const char* kTargetName = "Q4_DIGITIZING_OF_DATA";

struct InputFiles {
  char DataFileName[260];
  char FileName[260];
  char Projection[1024];
};

struct GridDescription {
  std::int32_t ZRange[2];
  float Spacing;
};

struct CalculationParameters {
  float SearchRadius;
  float MaxExtrapolationDistance[2];
  std::int32_t Analysis;  // 1 bilinear, 0 objective
};

struct ObjectiveAnalysisParameters {
  float ZeroCrossingDistance;
  float DecayDistance;
  float ErrorVariance;
  float MaxData;
  float MinData;
  std::int32_t FilterOperations;
  std::int32_t CorrelationSampleSize;
  std::int32_t FilterType;  // 1 twelve-point, 0 Shapiro
};

struct OutputData {
  char FileName[260];
  char Title[260];
  std::int32_t ItemType;
};

// The raw values of the parameter file; written once by readParameterFile.
struct RunParameters {
  InputFiles inputFiles;
  GridDescription gridDescription;
  CalculationParameters calculationParameters;
  ObjectiveAnalysisParameters objectiveAnalysisParameters;
  OutputData outputData;
};

// Loads the file, reads the five sections into parameters and echoes them to
// the log. 1 on success; on failure 0, after writing one cause line to the log
// ("Can't open NAME" or "FILE:LINE: REASON").
int readParameterFile(const char* path, RunParameters& parameters);

}  // namespace karnet

#endif  // KARNET_PARAMS_RUN_PARAMETERS_H_
