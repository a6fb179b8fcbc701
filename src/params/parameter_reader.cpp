// Reads the run's parameter file into a RunParameters record and echoes every value to
// the log as it goes.
#include <cstdio>
#include <cstring>
#include <string>

#include "control/log.h"
#include "params/parfile.h"
#include "params/run_parameters.h"

namespace karnet {


namespace {

constexpr const char* kRule =
    "======================================================================\n";

// The open parameter file (null when none is open) and its target.
ParFile* parameterFile = nullptr;
ParBlock* target = nullptr;

// Why the reading stopped: one line for the log.
std::string failureCause;

int noteLibraryFailure() {
  if (failureCause.empty()) failureCause = parErrorTextGlb();
  return 0;
}

bool equalsIgnoringCase(const char* a, const char* b) {
  for (;; ++a, ++b) {
    unsigned char ca = static_cast<unsigned char>(*a);
    unsigned char cb = static_cast<unsigned char>(*b);
    if (ca >= 'A' && ca <= 'Z') ca = static_cast<unsigned char>(ca - 'A' + 'a');
    if (cb >= 'A' && cb <= 'Z') cb = static_cast<unsigned char>(cb - 'A' + 'a');
    if (ca != cb) return false;
    if (ca == '\0') return true;
  }
}

int loadParameterFile(const char* path) {
  parameterFile = parLoadFile(path, 1);
  return parameterFile != nullptr;
}

int closeParameterFile() {
  parClose(&parameterFile);
  target = nullptr;
  return parameterFile == nullptr;
}

int getStringParam(const ParBlock* section, const char* keyword, const char** value,
                   int occurrence, int number) {
  const ParKeyword* found = parKeywordByNameNum(section, keyword, occurrence);
  if (found == nullptr) return 0;
  const ParParam* param = parParamByNum(found, number);
  if (param == nullptr) return 0;
  *value = parGetString(param);
  return parPeekErrorGlb() == 0;
}

// Copies a file name or the projection. A longer text than the field holds
// would name another file or projection, so it is refused, not cut.
bool copyWhole(const ParBlock* section, const char* keyword, const char* text,
               char* destination, std::size_t size) {
  const std::size_t length = std::strlen(text);
  if (length >= size) {
    failureCause = std::string(parFileName(parameterFile)) + ":" +
                   std::to_string(parKeywordLine(parKeywordByNameNum(section, keyword, 1))) +
                   ": keyword " + keyword + ": the value has " + std::to_string(length) +
                   " characters, at most " + std::to_string(size - 1) + " are allowed";
    return false;
  }
  std::memcpy(destination, text, length + 1);
  return true;
}

// Copies a text that is only shown (the title), cut to the field if need be,
// never inside a UTF-8 sequence.
void copyCut(char* destination, std::size_t size, const char* text) {
  std::size_t length = strnlen(text, size);
  if (length >= size) {
    length = size - 1;
    while (length > 0 && (static_cast<unsigned char>(text[length]) & 0xC0) == 0x80) --length;
  }
  std::memcpy(destination, text, length);
  destination[length] = '\0';
}

// Reads a text keyword into a 260-character buffer and compares it with word.
int readChoice(const ParBlock* section, const char* keyword, const char* word,
               std::int32_t* choice) {
  const char* text = nullptr;
  if (!getStringParam(section, keyword, &text, 1, 1)) return noteLibraryFailure();
  char buffer[260];
  copyCut(buffer, sizeof buffer, text);
  *choice = equalsIgnoringCase(buffer, word) ? 1 : 0;
  return 1;
}

ParBlock* section(const char* name) {
  ParBlock* found = parSectionByNameNum(target, name, 1);
  if (found == nullptr) noteLibraryFailure();
  return found;
}

int readInputFiles(char* dataFileName, char* fileName, char* projection) {
  const ParBlock* s = section("INPUT_FILES");
  if (s == nullptr) return 0;
  const char* text = nullptr;
  if (!parGetParamFilename(s, "DataFileName", &text, 1, 1)) return noteLibraryFailure();
  if (!copyWhole(s, "DataFileName", text, dataFileName, 260)) return 0;
  if (!parGetParamFilename(s, "FileName", &text, 1, 1)) return noteLibraryFailure();
  if (!copyWhole(s, "FileName", text, fileName, 260)) return 0;
  if (!getStringParam(s, "Projection", &text, 1, 1)) return noteLibraryFailure();
  if (!copyWhole(s, "Projection", text, projection, 1024)) return 0;
  return 1;
}

int readGridDescription(std::int32_t* zFirst, std::int32_t* zLast, float* spacing) {
  const ParBlock* s = section("DESCRIPTION_OF_GRID");
  if (s == nullptr) return 0;
  if (!parGetListParam(s, "ZRange", 1, "ii", zFirst, zLast)) return noteLibraryFailure();
  if (!parGetParam(s, "Spacing", spacing, 1, 1)) return noteLibraryFailure();
  return 1;
}

int readCalculationParameters(float* searchRadius, float* upward, float* downward,
                              std::int32_t* analysis) {
  const ParBlock* s = section("CALCULATION_PARAMETERS");
  if (s == nullptr) return 0;
  if (!parGetParam(s, "SearchRadius", searchRadius, 1, 1)) return noteLibraryFailure();
  if (!parGetListParam(s, "MaxExtrapolationDistance", 1, "ff", upward, downward)) {
    return noteLibraryFailure();
  }
  return readChoice(s, "Analysis", "bilinear", analysis);
}

int readObjectiveAnalysisParameters(float* zeroCrossingDistance, float* decayDistance,
                                    float* errorVariance, float* maxData, float* minData,
                                    std::int32_t* filterOperations,
                                    std::int32_t* correlationSampleSize,
                                    std::int32_t* filterType) {
  const ParBlock* s = section("OBJECTIVE_ANALYSIS_PARAMETERS");
  if (s == nullptr) return 0;
  if (!parGetParam(s, "ZeroCrossingDistance", zeroCrossingDistance, 1, 1) ||
      !parGetParam(s, "DecayDistance", decayDistance, 1, 1) ||
      !parGetParam(s, "ErrorVariance", errorVariance, 1, 1) ||
      !parGetParam(s, "MinData", minData, 1, 1) || !parGetParam(s, "MaxData", maxData, 1, 1) ||
      !parGetParam(s, "FilterOperations", filterOperations, 1, 1) ||
      !parGetParam(s, "CorrelationSampleSize", correlationSampleSize, 1, 1)) {
    return noteLibraryFailure();
  }
  return readChoice(s, "FilterType", "12 pts filter", filterType);
}

int readOutputData(char* fileName, char* title, std::int32_t* itemType) {
  const ParBlock* s = section("OUTPUT_DATA");
  if (s == nullptr) return 0;
  const char* text = nullptr;
  if (!parGetParamFilename(s, "FileName", &text, 1, 1)) return noteLibraryFailure();
  if (!copyWhole(s, "FileName", text, fileName, 260)) return 0;
  if (!getStringParam(s, "Title", &text, 1, 1)) return noteLibraryFailure();
  copyCut(title, 260, text);
  if (!parGetParam(s, "ItemType", itemType, 1, 1)) return noteLibraryFailure();
  return 1;
}

int readAllSections(RunParameters& p) {
  const bool echo = logStream != nullptr;

  target = parTargetByNameNum(parameterFile, kTargetName, 1);
  if (target == nullptr) return noteLibraryFailure();
  if (echo) {
    logPrintf("%s", kRule);
    logPrintf("TARGET: Q4_DIGITIZING_OF_DATA\n");
  }

  InputFiles& in = p.inputFiles;
  if (!readInputFiles(in.DataFileName, in.FileName, in.Projection)) return 0;
  if (echo) {
    logPrintf("\tsection: INPUT_FILES ---------------------------------\n");
    logPrintf("\t\tFileName : %s\n", in.FileName);
    logPrintf("\t\tDataFileName : %s\n", in.DataFileName);
    logPrintf("\t\tProjection: %s\n", in.Projection);
  }

  GridDescription& grid = p.gridDescription;
  if (!readGridDescription(&grid.ZRange[0], &grid.ZRange[1], &grid.Spacing)) return 0;
  if (echo) {
    logPrintf("\tsection : DESCRIPTION_OF_GRID ------------------------\n");
    logPrintf("\t\tZRange : %d, %d\n", grid.ZRange[0], grid.ZRange[1]);
    logPrintf("\t\tSpacing : %f\n", static_cast<double>(grid.Spacing));
  }

  CalculationParameters& calc = p.calculationParameters;
  if (!readCalculationParameters(&calc.SearchRadius, &calc.MaxExtrapolationDistance[0],
                                 &calc.MaxExtrapolationDistance[1], &calc.Analysis)) {
    return 0;
  }
  if (echo) {
    logPrintf("\tsection : CALCULATION_PARAMETERS ---------------------\n");
    logPrintf("\t\tSearchRadius: %f\n", static_cast<double>(calc.SearchRadius));
    logPrintf("\t\tMaxExtrapolationDistance : %f, %f\n",
              static_cast<double>(calc.MaxExtrapolationDistance[0]),
              static_cast<double>(calc.MaxExtrapolationDistance[1]));
    logPrintf("\t\tAnalysis : %s\n", calc.Analysis != 0 ? "bilinear" : "objective");
  }

  ObjectiveAnalysisParameters& oa = p.objectiveAnalysisParameters;
  if (!readObjectiveAnalysisParameters(&oa.ZeroCrossingDistance, &oa.DecayDistance,
                                       &oa.ErrorVariance, &oa.MaxData, &oa.MinData,
                                       &oa.FilterOperations, &oa.CorrelationSampleSize,
                                       &oa.FilterType)) {
    return 0;
  }
  if (echo) {
    logPrintf("\tsection : OBJECTIVE_ANALYSIS_PARAMETERS --------------\n");
    logPrintf("\t\tZeroCrossingDistance: %f\n", static_cast<double>(oa.ZeroCrossingDistance));
    logPrintf("\t\tDecayDistance : %f\n", static_cast<double>(oa.DecayDistance));
    logPrintf("\t\tErrorVariance : %f\n", static_cast<double>(oa.ErrorVariance));
    logPrintf("\t\tMinData : %f\n", static_cast<double>(oa.MinData));
    logPrintf("\t\tMaxData : %f\n", static_cast<double>(oa.MaxData));
    logPrintf("\t\tFilterOperations : %d\n", oa.FilterOperations);
    logPrintf("\t\tCorrelationSampleSize : %d\n", oa.CorrelationSampleSize);
    logPrintf("\t\tFilterType : %s \n", oa.FilterType != 0 ? "12 pts filter" : "shapiro");
  }

  OutputData& out = p.outputData;
  if (!readOutputData(out.FileName, out.Title, &out.ItemType)) return 0;
  if (echo) {
    logPrintf("\tsection : OUTPUT_DATA --------------------------------\n");
    logPrintf("\t\tFileName : %s\n", out.FileName);
    logPrintf("\t\tTitle : %s\n", out.Title);
    logPrintf("\t\tItemType : %d\n", out.ItemType);
    logPrintf("%s", kRule);
  }
  return 1;
}

}  // namespace

int readParameterFile(const char* path, RunParameters& parameters) {
  parameters = RunParameters{};
  failureCause.clear();
  if (!loadParameterFile(path)) {
    // "Can't open NAME" for a file that cannot be read, "NAME:LINE: REASON"
    // for one that is not a well-formed parameter file.
    logWrite(parErrorTextGlb());
    return 0;
  }
  const int result = readAllSections(parameters);
  closeParameterFile();
  if (result == 0) logWrite(failureCause.empty() ? "parameter file incomplete" : failureCause.c_str());
  return result;
}

}  // namespace karnet
