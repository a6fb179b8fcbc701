// What a result file records about the run that made it.
#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <map>

#include "output/result_attributes.h"
#include "params/run_parameters.h"

namespace karnet {
namespace {

RunParameters parameters(std::int32_t analysis) {
  RunParameters p{};
  std::strcpy(p.inputFiles.DataFileName, "casts.txt");
  std::strcpy(p.inputFiles.FileName, "bathymetry.nc");
  std::strcpy(p.outputData.Title, "Basin temperature");
  p.gridDescription.ZRange[0] = 0;
  p.gridDescription.ZRange[1] = 19;
  p.gridDescription.Spacing = 2.5f;
  p.calculationParameters.SearchRadius = 3000.0f;
  p.calculationParameters.MaxExtrapolationDistance[0] = 5.0f;
  p.calculationParameters.MaxExtrapolationDistance[1] = 0.1f;
  p.calculationParameters.Analysis = analysis;
  p.objectiveAnalysisParameters.DecayDistance = 2500.0f;
  p.objectiveAnalysisParameters.FilterType = 1;
  p.objectiveAnalysisParameters.FilterOperations = 2;
  return p;
}

TEST(ResultAttributes, RecordWhatMadeTheResult) {
  const TextAttributes bilinear =
      resultGlobalAttributes(parameters(1), "karnet --quiet 'my case.pfs'", "1.2.3", 86400);
  std::map<std::string, std::string> a(bilinear.begin(), bilinear.end());
  EXPECT_EQ(bilinear.front().first, "title");
  EXPECT_EQ(a["title"], "Basin temperature");
  EXPECT_EQ(a["history"], "1970-01-02T00:00:00Z: karnet --quiet 'my case.pfs'");
  EXPECT_EQ(a["source"], "karnet 1.2.3");
  EXPECT_EQ(a["method"], "bilinear / distance-weighted interpolation");
  EXPECT_EQ(a["method_parameters"],
            "SearchRadius = 3000 m; MaxExtrapolationDistance = 5, 0.1 m; FilterOperations = 2; "
            "ZRange = 0, 19; Spacing = 2.5 m");
  EXPECT_EQ(a["input_observations"], "casts.txt");
  EXPECT_EQ(a["input_bathymetry"], "bathymetry.nc");

  const TextAttributes oa = resultGlobalAttributes(parameters(0), "karnet x.pfs", "1", 0);
  std::map<std::string, std::string> b(oa.begin(), oa.end());
  EXPECT_EQ(b["method"], "objective analysis (optimal interpolation)");
  EXPECT_NE(b["method_parameters"].find("DecayDistance = 2500 m"), std::string::npos);
  EXPECT_NE(b["method_parameters"].find("FilterType = 12 pts filter"), std::string::npos);
}

TEST(ResultAttributes, TimestampFromSourceDateEpoch) {
  setenv("SOURCE_DATE_EPOCH", "1700000000", 1);
  EXPECT_EQ(resultTimestamp(), 1700000000);
  setenv("SOURCE_DATE_EPOCH", "soon", 1);
  EXPECT_GT(resultTimestamp(), 1700000000);
  unsetenv("SOURCE_DATE_EPOCH");
}

}  // namespace
}  // namespace karnet
