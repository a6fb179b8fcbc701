// The cross-validation request on the command line, the sweep's combinations
// and the tables.
#include "control/cross_validate_run.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace karnet {
namespace {

// Runs takeCrossValidationArguments on a copy of the arguments; the remaining
// arguments come back in rest.
bool take(std::vector<std::string> arguments, CrossValidationRequest& request,
          std::vector<std::string>& rest, std::string& error) {
  std::vector<char*> pointers;
  for (std::string& a : arguments) pointers.push_back(a.data());
  int count = static_cast<int>(pointers.size());
  const bool ok = takeCrossValidationArguments(count, pointers.data(), request, error);
  rest.assign(pointers.begin(), pointers.begin() + count);
  return ok;
}

TEST(CrossValidationArguments, AreTakenOutLeavingAnOrdinaryCommandLine) {
  CrossValidationRequest request;
  std::vector<std::string> rest;
  std::string error;
  ASSERT_TRUE(take({"//apv", "--cross-validate", "case.pfs"}, request, rest, error));
  EXPECT_TRUE(request.active);
  EXPECT_TRUE(request.sweep.empty());
  EXPECT_EQ(rest, (std::vector<std::string>{"//apv", "case.pfs"}));

  ASSERT_TRUE(take({"--SWEEP", "decaydistance=1000,2e3,4000", "ErrorVariance=5", "x=y.pfs"},
                   request, rest, error))
      << error;
  EXPECT_TRUE(request.active);
  ASSERT_EQ(request.sweep.size(), 2u);
  EXPECT_EQ(request.sweep[0].name, "DecayDistance");
  EXPECT_EQ(request.sweep[0].values, (std::vector<double>{1000, 2000, 4000}));
  EXPECT_EQ(request.sweep[1].name, "ErrorVariance");
  // The last argument stays the parameter file even with a '=' in its name.
  EXPECT_EQ(rest, (std::vector<std::string>{"x=y.pfs"}));

  ASSERT_TRUE(take({"-debug", "case.pfs"}, request, rest, error));
  EXPECT_FALSE(request.active);
  EXPECT_EQ(rest.size(), 2u);
}

TEST(CrossValidationArguments, MalformedRequestsAreRefusedWithTheReason) {
  const std::string thirtyTwo = "1,2,3,4,5,6,7,8,9,10,11,12,13,14,15,16,17,18,19,20,21,22,23,24,"
                                "25,26,27,28,29,30,31,32";
  const struct {
    std::vector<std::string> arguments;
    std::string words;
  } cases[] = {
      {{"--sweep", "case.pfs"}, "needs at least one"},
      {{"--sweep", "Decay=1,2", "case.pfs"}, "unknown keyword 'Decay'"},
      {{"--sweep", "FilterType=1", "case.pfs"}, "FilterType does not change"},
      {{"--sweep", "DecayDistance=1000,abc", "case.pfs"}, "'abc' is not a number above 0"},
      {{"--sweep", "DecayDistance=0", "case.pfs"}, "not a number above 0"},
      {{"--sweep", "DecayDistance=1000,", "case.pfs"}, "value '' is not"},
      {{"--sweep", "ErrorVariance=101", "case.pfs"}, "from 0 to 100"},
      {{"--sweep", "CorrelationSampleSize=2.5", "case.pfs"}, "whole number"},
      {{"--sweep", "SearchRadius=-1", "case.pfs"}, "at least 0"},
      {{"--sweep", "MinData=nan", "case.pfs"}, "finite number"},
      {{"--sweep", "ErrorVariance=1", "errorvariance=2", "case.pfs"}, "given twice"},
      {{"--sweep", "DecayDistance=1,2", "ErrorVariance=3"}, "parameter file must be the last"},
      {{"--sweep", "DecayDistance=" + thirtyTwo, "ErrorVariance=" + thirtyTwo, "case.pfs"},
       "more than 1000 combinations"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.arguments[1]);
    CrossValidationRequest request;
    std::vector<std::string> rest;
    std::string error;
    EXPECT_FALSE(take(c.arguments, request, rest, error));
    EXPECT_NE(error.find(c.words), std::string::npos) << error;
  }
}

TEST(CrossValidationSweep, TrialsCoverEveryCombinationFirstKeywordSlowest) {
  RunSettings base;
  base.DecayDistance = 50.0f;
  base.ErrorVariance = 5.0f;
  base.CorrelationSampleSize = 8;
  base.SearchRadius = 100.0f;
  EXPECT_EQ(sweepTrials(base, {}).size(), 1u);
  const std::vector<SweepKeyword> sweep = {{"ErrorVariance", {1, 10}},
                                           {"CorrelationSampleSize", {2, 4, 6}}};
  const std::vector<RunSettings> trials = sweepTrials(base, sweep);
  ASSERT_EQ(trials.size(), 6u);
  for (std::size_t t = 0; t < trials.size(); ++t) {
    EXPECT_EQ(trials[t].ErrorVariance, t < 3 ? 1.0f : 10.0f);
    EXPECT_EQ(trials[t].CorrelationSampleSize, 2 + 2 * static_cast<int>(t % 3));
    EXPECT_EQ(trials[t].DecayDistance, 50.0f);  // not swept: the file's value
    EXPECT_EQ(sweptValue(trials[t], "CorrelationSampleSize"), trials[t].CorrelationSampleSize);
  }
}

CvStats stats(std::int64_t nodes, std::int64_t missed, double sum, double square) {
  CvStats s;
  s.nodes = nodes;
  s.missed = missed;
  s.sumDifference = sum;
  s.sumSquare = square;
  return s;
}

TEST(CrossValidationTables, LevelTableHasDepthsAndAnOverallRow) {
  RunSettings s;
  s.l0 = 3;
  s.lx = 6;
  s.dz = 2.5f;
  CvResult r;
  r.firstLevel = 3;
  r.levels = {stats(4, 0, -2.0, 4.0), CvStats{}, stats(0, 2, 0, 0), stats(1, 1, 3.0, 9.0)};
  for (const CvStats& level : r.levels) r.overall.add(level);
  // Level l lies (lx + 1 - l) * dz below the surface; levels with nothing are left out.
  EXPECT_EQ(cvLevelCsv(r, s),
            "level,depth_m,nodes,missed,rms,bias\n"
            "3,10,4,0,1,-0.5\n"
            "5,5,0,2,,\n"
            "6,2.5,1,1,3,3\n"
            "all,,5,3,1.61245155,0.2\n");
  const std::string text = cvLevelText(r, s);
  EXPECT_NE(text.find("   all                   5        3      1.61245          0.2\n"),
            std::string::npos)
      << text;
}

TEST(CrossValidationTables, SweepTableMarksTheLowestRms) {
  RunSettings base;
  const std::vector<SweepKeyword> sweep = {{"DecayDistance", {1000, 2000, 4000}}};
  const std::vector<RunSettings> trials = sweepTrials(base, sweep);
  std::vector<CvResult> results(3);
  results[0].overall = stats(4, 0, 0.0, 16.0);  // rms 2
  results[1].overall = stats(4, 0, 2.0, 4.0);   // rms 1
  results[2].overall = stats(0, 4, 0.0, 0.0);   // nothing compared: never best
  EXPECT_EQ(bestTrial(results), 1);
  EXPECT_EQ(cvSweepCsv(results, trials, sweep),
            "DecayDistance,nodes,missed,rms,bias,best\n"
            "1000,4,0,2,0,\n"
            "2000,4,0,1,0.5,*\n"
            "4000,0,4,,,\n");
  const std::string text = cvSweepText(results, trials, sweep);
  EXPECT_NE(text.find("2000        4        0            1          0.5  <- best\n"),
            std::string::npos)
      << text;
  EXPECT_EQ(bestTrial({results[2]}), -1);

  // A trial that left nodes without an estimate does not compete, however low its RMS.
  results[0].overall = stats(3, 1, 0.0, 0.03);
  EXPECT_EQ(bestTrial(results), 1);
  EXPECT_NE(cvSweepText(results, trials, sweep).find("different numbers of nodes"),
            std::string::npos);
}

TEST(CrossValidationTables, LieBesideTheParameterFile) {
  EXPECT_EQ(besideParameterFile("runs/case.pfs", "_cv.csv"), "runs/case_cv.csv");
  EXPECT_EQ(besideParameterFile("case", "_cv.csv"), "case_cv.csv");
  EXPECT_EQ(besideParameterFile("a.b/case", "_sweep.csv"), "a.b/case_sweep.csv");
}

}  // namespace
}  // namespace karnet
