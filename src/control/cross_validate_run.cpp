// The cross-validation mode of the program: its command-line request, the
// combinations of a sweep, and the run that computes and reports them.
#include "control/cross_validate_run.h"

#include <strings.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "control/log.h"
#include "control/progress.h"
#include "control/run_driver.h"
#include "control/signals.h"
#include "control/termination.h"
#include "input/bathymetry_scan.h"
#include "input/data_scan.h"
#include "input/run_initialise.h"
#include "interp/setadj.h"
#include "state/run_context.h"
#include "state/run_state.h"
#include "support/run_error.h"

namespace karnet {
namespace {

enum class Rule { kPositive, kNonNegative, kPercent, kCount, kAny };

struct KeywordEntry {
  const char* name;
  Rule rule;
};

// The keywords a sweep may vary: those that the selection and the estimator
// read. The smoothing keywords act only on whole layers, which the
// cross-validation does not analyse.
constexpr KeywordEntry kKeywords[] = {
    {"DecayDistance", Rule::kPositive},   {"ZeroCrossingDistance", Rule::kPositive},
    {"ErrorVariance", Rule::kPercent},    {"CorrelationSampleSize", Rule::kCount},
    {"SearchRadius", Rule::kNonNegative}, {"MinData", Rule::kAny},
    {"MaxData", Rule::kAny},
};

const KeywordEntry* findKeyword(const std::string& name) {
  for (const KeywordEntry& entry : kKeywords) {
    if (strcasecmp(entry.name, name.c_str()) == 0) return &entry;
  }
  return nullptr;
}

const char* ruleText(Rule rule) {
  switch (rule) {
    case Rule::kPositive:
      return "a number above 0";
    case Rule::kNonNegative:
      return "a number of at least 0";
    case Rule::kPercent:
      return "a number from 0 to 100";
    case Rule::kCount:
      return "a whole number of at least 1";
    case Rule::kAny:
      break;
  }
  return "a finite number";
}

bool followsRule(Rule rule, double value) {
  const auto single = static_cast<float>(value);
  if (!std::isfinite(value) || !std::isfinite(single)) return false;
  switch (rule) {
    case Rule::kPositive:
      return single > 0.0f;
    case Rule::kNonNegative:
      return single >= 0.0f;
    case Rule::kPercent:
      return single >= 0.0f && single <= 100.0f;
    case Rule::kCount:
      return value >= 1.0 && value <= 2147483647.0 && value == std::floor(value);
    case Rule::kAny:
      break;
  }
  return true;
}

bool parseNumber(const std::string& text, double& value) {
  if (text.empty()) return false;
  errno = 0;
  char* end = nullptr;
  value = std::strtod(text.c_str(), &end);
  return errno == 0 && end != nullptr && *end == '\0';
}

// "KEY=V1,V2,..." into a keyword; false with a message when malformed.
bool parseSweepArgument(const std::string& argument, SweepKeyword& keyword, std::string& error) {
  const std::size_t equals = argument.find('=');
  const std::string name = argument.substr(0, equals);
  const KeywordEntry* entry = findKeyword(name);
  if (entry == nullptr) {
    if (strcasecmp(name.c_str(), "FilterOperations") == 0 ||
        strcasecmp(name.c_str(), "FilterType") == 0) {
      error = "--sweep: " + name +
              " does not change the cross-validation (estimates are compared before the "
              "layer smoothing)";
      return false;
    }
    error = "--sweep: unknown keyword '" + name + "'; one of DecayDistance, "
            "ZeroCrossingDistance, ErrorVariance, CorrelationSampleSize, SearchRadius, "
            "MinData, MaxData";
    return false;
  }
  keyword.name = entry->name;
  keyword.values.clear();
  const std::string list = argument.substr(equals + 1);
  std::size_t start = 0;
  while (true) {
    const std::size_t comma = list.find(',', start);
    const std::string item =
        list.substr(start, comma == std::string::npos ? std::string::npos : comma - start);
    double value = 0.0;
    if (!parseNumber(item, value) || !followsRule(entry->rule, value)) {
      error = "--sweep: " + keyword.name + " value '" + item + "' is not " + ruleText(entry->rule);
      return false;
    }
    keyword.values.push_back(value);
    if (comma == std::string::npos) break;
    start = comma + 1;
  }
  return true;
}

void setKeyword(RunSettings& s, const std::string& name, double value) {
  const auto single = static_cast<float>(value);
  if (name == "DecayDistance") s.DecayDistance = single;
  if (name == "ZeroCrossingDistance") s.ZeroCrossingDistance = single;
  if (name == "ErrorVariance") s.ErrorVariance = single;
  if (name == "CorrelationSampleSize") s.CorrelationSampleSize = static_cast<std::int32_t>(value);
  if (name == "SearchRadius") s.SearchRadius = single;
  if (name == "MinData") s.MinData = single;
  if (name == "MaxData") s.MaxData = single;
}

// Writes text to path through a temporary file in the same directory, so that
// path never holds a partial table. false when it could not.
bool writeWhole(const std::string& path, const std::string& text) {
  std::string temporary = path + ".XXXXXX";
  const int fd = ::mkstemp(temporary.data());
  if (fd < 0) return false;
  std::FILE* file = ::fdopen(fd, "w");
  if (file == nullptr) {
    ::close(fd);
    ::unlink(temporary.c_str());
    return false;
  }
  const bool written = std::fwrite(text.data(), 1, text.size(), file) == text.size();
  const bool readable = ::fchmod(fd, 0644) == 0;
  const bool closed = std::fclose(file) == 0;
  if (!written || !readable || !closed || std::rename(temporary.c_str(), path.c_str()) != 0) {
    ::unlink(temporary.c_str());
    return false;
  }
  return true;
}

}  // namespace

bool takeCrossValidationArguments(int& count, char** arguments, CrossValidationRequest& request,
                                  std::string& error) {
  request = CrossValidationRequest{};
  int kept = 0;
  for (int i = 0; i < count; ++i) {
    if (strcasecmp(arguments[i], "--cross-validate") == 0) {
      request.active = true;
      continue;
    }
    if (strcasecmp(arguments[i], "--sweep") == 0) {
      request.active = true;
      int taken = 0;
      // The last argument is the parameter file, never a sweep list.
      while (i + 1 < count - 1 && std::strchr(arguments[i + 1], '=') != nullptr) {
        ++i;
        SweepKeyword keyword;
        if (!parseSweepArgument(arguments[i], keyword, error)) return false;
        for (const SweepKeyword& other : request.sweep) {
          if (other.name == keyword.name) {
            error = "--sweep: " + keyword.name + " is given twice";
            return false;
          }
        }
        request.sweep.push_back(keyword);
        ++taken;
      }
      if (taken == 0) {
        error = "--sweep needs at least one KEYWORD=VALUE,VALUE,... before the parameter file";
        return false;
      }
      continue;
    }
    arguments[kept++] = arguments[i];
  }
  count = kept;
  // "--sweep A=1,2 B=3" without a parameter file would take "B=3" for one.
  if (!request.sweep.empty() && count > 0) {
    const std::string last = arguments[count - 1];
    const std::size_t equals = last.find('=');
    if (equals != std::string::npos && findKeyword(last.substr(0, equals)) != nullptr) {
      error = "--sweep: the parameter file must be the last argument, after '" + last + "'";
      return false;
    }
  }
  std::size_t combinations = 1;
  for (const SweepKeyword& keyword : request.sweep) {
    combinations *= keyword.values.size();
    if (combinations > kMaxSweepCombinations) {
      error = "--sweep: more than " + std::to_string(kMaxSweepCombinations) + " combinations";
      return false;
    }
  }
  return true;
}

std::vector<RunSettings> sweepTrials(const RunSettings& base,
                                     const std::vector<SweepKeyword>& sweep) {
  std::vector<RunSettings> trials{base};
  for (const SweepKeyword& keyword : sweep) {
    std::vector<RunSettings> next;
    for (const RunSettings& trial : trials) {
      for (const double value : keyword.values) {
        next.push_back(trial);
        setKeyword(next.back(), keyword.name, value);
      }
    }
    trials.swap(next);
  }
  return trials;
}

double sweptValue(const RunSettings& s, const std::string& name) {
  if (name == "DecayDistance") return s.DecayDistance;
  if (name == "ZeroCrossingDistance") return s.ZeroCrossingDistance;
  if (name == "ErrorVariance") return s.ErrorVariance;
  if (name == "CorrelationSampleSize") return s.CorrelationSampleSize;
  if (name == "SearchRadius") return s.SearchRadius;
  if (name == "MinData") return s.MinData;
  if (name == "MaxData") return s.MaxData;
  return 0.0;
}

std::string besideParameterFile(const std::string& parameterFile, const std::string& suffix) {
  const std::size_t slash = parameterFile.rfind('/');
  const std::size_t nameStart = slash == std::string::npos ? 0 : slash + 1;
  const std::size_t dot = parameterFile.rfind('.');
  const std::size_t stem = dot != std::string::npos && dot > nameStart ? dot : parameterFile.size();
  return parameterFile.substr(0, stem) + suffix;
}

void crossValidateRun(Run& run, const char* parameterFile) {
  const RunSettings& base = run.settings;
  if (base.Analysis != 0) {
    throw RunError::fatal("Cross-validation needs objective analysis (Analysis is bilinear)");
  }
  const std::vector<RunSettings> trials = sweepTrials(base, run.invocation.crossValidation.sweep);
  // A swept range must not pass off a combination that a run would refuse.
  for (const RunSettings& trial : trials) {
    if (!(trial.DecayDistance > 0.0f && trial.ZeroCrossingDistance > 0.0f)) {
      throw RunError::fatal(
          "Cross-validation needs DecayDistance and ZeroCrossingDistance above 0");
    }
  }

  installSignalHandlers();
  RunState& state = run.state;
  const RunContext context{run.settings, runLog(), run.cartography.get(), run.invocation.threads};
  runInitialise(state, context);
  std::int32_t lastObs = -1, jOff = 0, kOff = 0, lOff = 0;
  progressStatus("Scanning data ...");
  dataScan(state, context, run.parameters.inputFiles.FileName, &lastObs, &jOff, &kOff, &lOff);
  progressStatus("Scanning bathymetry ...");
  bathymetryScan(jOff, kOff, lOff, state, base);
  progressStatus("Initialising ...");
  setadj(lastObs, state, base);

  progressStatus("Cross-validating ...");
  CvInput input;
  input.values = &state.basicValues;
  input.bathymetry = &state.basicBathymetry;
  input.landValue = state.landValue;
  input.deleteValue = state.deleteValue();
  input.jOff = jOff;
  input.kOff = kOff;
  input.lOff = lOff;
  const std::int64_t casts = countValidatedCasts(input, base);
  if (casts == 0) {
    throw RunError::fatal("Cross-validation: no cast has data at a wet node of the grid");
  }
  const std::vector<CvResult> results = crossValidate(input, trials, context.threads);

  const std::vector<SweepKeyword>& sweepKeywords = run.invocation.crossValidation.sweep;
  const bool sweep = !sweepKeywords.empty();
  const std::string csvPath =
      besideParameterFile(parameterFile, sweep ? "_sweep.csv" : "_cv.csv");
  const std::string csv = sweep ? cvSweepCsv(results, trials, sweepKeywords)
                                : cvLevelCsv(results.front(), base);
  if (!writeWhole(csvPath, csv)) throw RunError::fatal("Can't write " + csvPath);

  char heading[512];
  if (sweep) {
    std::snprintf(heading, sizeof heading,
                  "Cross-validation sweep: %zu combinations, %lld casts left out one at a time\n",
                  trials.size(), static_cast<long long>(casts));
  } else {
    std::snprintf(heading, sizeof heading,
                  "Cross-validation: %lld casts left out one at a time\n",
                  static_cast<long long>(casts));
  }
  const std::string table = sweep ? cvSweepText(results, trials, sweepKeywords)
                                  : cvLevelText(results.front(), base);
  std::fputs(heading, stdout);
  std::fputs(table.c_str(), stdout);
  std::printf("Table written to %s\n", csvPath.c_str());
  std::fflush(stdout);

  Report& report = context.report;
  report.printf("\n-------------------------------------------------\n");
  report.write(heading);
  report.write(table.c_str());
  report.printf("Table written to %s\n", csvPath.c_str());
  report.printf("-------------------------------------------------\n\n");

  releaseAll(state);
  restoreSignalHandlers();
}

}  // namespace karnet
