#ifndef KARNET_CONTROL_CROSS_VALIDATE_RUN_H_
#define KARNET_CONTROL_CROSS_VALIDATE_RUN_H_

#include <cstdint>
#include <string>
#include <vector>

#include "analysis/cross_validation.h"
#include "control/cross_validate_request.h"
#include "params/run_settings.h"

namespace karnet {

struct Run;

// Most combinations one sweep may ask for.
inline constexpr std::size_t kMaxSweepCombinations = 1000;

// Takes "--cross-validate" and "--sweep KEY=V1,V2,... [KEY=...]" (any case)
// out of the arguments, in place, so that what remains is an ordinary command
// line (the parameter file still last). "--sweep" takes every following
// argument with a '=' except the last argument. false, with a message in
// error, when the request is malformed: an unknown or repeated keyword, a
// value that is not a number or breaks the keyword's rule, no keyword after
// "--sweep", more than kMaxSweepCombinations combinations.
bool takeCrossValidationArguments(int& count, char** arguments, CrossValidationRequest& request,
                                  std::string& error);

// Every combination of the swept values (the first keyword varies slowest),
// each a copy of base with those values set; just base without a sweep.
std::vector<RunSettings> sweepTrials(const RunSettings& base,
                                     const std::vector<SweepKeyword>& sweep);

// The value a trial uses for a swept keyword.
double sweptValue(const RunSettings& trial, const std::string& name);

// Tables of the results. Levels are the local levels (depth below the surface
// from the level spacing); rms and bias are analysis minus data.
// The per-level table of one cross-validation, CSV with the columns
// level,depth_m,nodes,missed,rms,bias and a last row "all".
std::string cvLevelCsv(const CvResult& result, const RunSettings& settings);
// The same as text for the terminal and the log.
std::string cvLevelText(const CvResult& result, const RunSettings& settings);
// Index of the trial with the lowest overall RMS among those that compared
// the most nodes (the first of equals); -1 when none compared a node.
std::int64_t bestTrial(const std::vector<CvResult>& results);
// The sweep table, CSV: one column per swept keyword, then
// nodes,missed,rms,bias,best ("*" on the best row).
std::string cvSweepCsv(const std::vector<CvResult>& results, const std::vector<RunSettings>& trials,
                       const std::vector<SweepKeyword>& sweep);
// The same as text, the best row marked "<- best".
std::string cvSweepText(const std::vector<CvResult>& results,
                        const std::vector<RunSettings>& trials,
                        const std::vector<SweepKeyword>& sweep);

// The file beside the parameter file: its name without the extension, plus
// suffix ("case.pfs", "_cv.csv" -> "case_cv.csv").
std::string besideParameterFile(const std::string& parameterFile, const std::string& suffix);

// Runs the cross-validation of the parameter file that setupRun has read
// into run: data scan, bathymetry scan and observation gridding as in a run,
// then the leave-one-cast-out estimates for every trial of the request, on
// run.invocation.threads threads. Prints the table on stdout, writes it as CSV
// beside the parameter file and into the log. No result file is written.
// Throws a RunError on failure.
void crossValidateRun(Run& run, const char* parameterFile);

}  // namespace karnet

#endif  // KARNET_CONTROL_CROSS_VALIDATE_RUN_H_
