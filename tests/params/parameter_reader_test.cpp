#include <gtest/gtest.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <tuple>

#include "control/log.h"
#include "common/temp_dir.h"
#include "params/run_parameters.h"

namespace karnet {
namespace {

// What the reader read last.
RunParameters runParameters;

// A parameter file with every section and keyword.
const std::string kComplete =
    "// Temperature of the western Baltic on a 3-D grid\n"
    "[Q4_DIGITIZING_OF_DATA]\n"
    "   [INPUT_FILES]\n"
    "      DataFileName = |./observations.txt|\n"
    "      FileName = |./bathymetry.nc|\n"
    "      Projection = 'UTM-32'\n"
    "   EndSect  // INPUT_FILES\n"
    "   [DESCRIPTION_OF_GRID]\n"
    "      ZRange = 0, 19\n"
    "      Spacing = 2.5\n"
    "   EndSect  // DESCRIPTION_OF_GRID\n"
    "   [CALCULATION_PARAMETERS]\n"
    "      SearchRadius = 5000\n"
    "      MaxExtrapolationDistance = 10, 20\n"
    "      Analysis = 'objective'\n"
    "   EndSect  // CALCULATION_PARAMETERS\n"
    "   [OBJECTIVE_ANALYSIS_PARAMETERS]\n"
    "      ZeroCrossingDistance = 20000\n"
    "      DecayDistance = 8000\n"
    "      ErrorVariance = 0.1\n"
    "      MinData = -2\n"
    "      MaxData = 30\n"
    "      FilterOperations = 2\n"
    "      CorrelationSampleSize = 20\n"
    "      FilterType = '12 pts filter'\n"
    "   EndSect  // OBJECTIVE_ANALYSIS_PARAMETERS\n"
    "   [OUTPUT_DATA]\n"
    "      FileName = |./result.nc|\n"
    "      Title = 'Temperature, western Baltic'\n"
    "      ItemType = 2\n"
    "   EndSect  // OUTPUT_DATA\n"
    "EndSect  // Q4_DIGITIZING_OF_DATA\n";

// The first `parts` parts of the echo of kComplete read from directory dir:
// the target line, then the five sections in order, the last with the closing rule.
std::string echo(const std::string& dir, int parts) {
  const std::string rule(70, '=');
  const std::string all[] = {
      rule + "\nTARGET: Q4_DIGITIZING_OF_DATA\n",
      "\tsection: INPUT_FILES ---------------------------------\n"
      "\t\tFileName : " + dir + "/bathymetry.nc\n"
      "\t\tDataFileName : " + dir + "/observations.txt\n"
      "\t\tProjection: UTM-32\n",
      "\tsection : DESCRIPTION_OF_GRID ------------------------\n"
      "\t\tZRange : 0, 19\n"
      "\t\tSpacing : 2.500000\n",
      "\tsection : CALCULATION_PARAMETERS ---------------------\n"
      "\t\tSearchRadius: 5000.000000\n"
      "\t\tMaxExtrapolationDistance : 10.000000, 20.000000\n"
      "\t\tAnalysis : objective\n",
      "\tsection : OBJECTIVE_ANALYSIS_PARAMETERS --------------\n"
      "\t\tZeroCrossingDistance: 20000.000000\n"
      "\t\tDecayDistance : 8000.000000\n"
      "\t\tErrorVariance : 0.100000\n"
      "\t\tMinData : -2.000000\n"
      "\t\tMaxData : 30.000000\n"
      "\t\tFilterOperations : 2\n"
      "\t\tCorrelationSampleSize : 20\n"
      "\t\tFilterType : 12 pts filter \n",
      "\tsection : OUTPUT_DATA --------------------------------\n"
      "\t\tFileName : " + dir + "/result.nc\n"
      "\t\tTitle : Temperature, western Baltic\n"
      "\t\tItemType : 2\n" + rule + "\n"};
  std::string text;
  for (int i = 0; i < parts; ++i) text += all[i];
  return text;
}

// text with the first occurrence of from replaced by to.
std::string with(std::string text, const std::string& from, const std::string& to) {
  const std::size_t at = text.find(from);
  EXPECT_NE(at, std::string::npos) << from;
  return at == std::string::npos ? text : text.replace(at, from.size(), to);
}

// "run.pfs:LINE: " for the first line of text that contains needle.
std::string where(const std::string& text, const std::string& needle) {
  const std::size_t at = std::min(text.find(needle), text.size());
  EXPECT_LT(at, text.size()) << needle;
  const auto line = 1 + std::count(text.begin(), text.begin() + static_cast<long>(at), '\n');
  return "run.pfs:" + std::to_string(line) + ": ";
}

// Runs readParameterFile with the log going to a buffer.
class ParameterReaderTest : public ::testing::Test {
 protected:
  int read(const std::string& text) {
    const std::string path = dir_.write("run.pfs", text);
    char* buffer = nullptr;
    std::size_t size = 0;
    std::FILE* stream = open_memstream(&buffer, &size);
    logSetStream(stream);
    const int result = readParameterFile(path.c_str(), runParameters);
    logSetStream(nullptr);
    std::fclose(stream);
    log_.assign(buffer, size);
    std::free(buffer);
    return result;
  }

  test::TempDir dir_;
  std::string log_;
};

TEST_F(ParameterReaderTest, CompleteFileIsReadAndEchoedExactly) {
  ASSERT_EQ(read(kComplete), 1) << log_;
  const std::string& d = dir_.path();
  EXPECT_EQ(log_, echo(d, 6));

  const RunParameters& p = runParameters;
  EXPECT_EQ(std::string(p.inputFiles.DataFileName), d + "/observations.txt");
  EXPECT_EQ(std::string(p.inputFiles.FileName), d + "/bathymetry.nc");
  EXPECT_STREQ(p.inputFiles.Projection, "UTM-32");
  const GridDescription& g = p.gridDescription;
  EXPECT_EQ(std::tuple(g.ZRange[0], g.ZRange[1], g.Spacing), std::tuple(0, 19, 2.5f));
  const CalculationParameters& c = p.calculationParameters;
  EXPECT_EQ(std::tuple(c.SearchRadius, c.MaxExtrapolationDistance[0],
                       c.MaxExtrapolationDistance[1], c.Analysis),
            std::tuple(5000.0f, 10.0f, 20.0f, 0));
  const ObjectiveAnalysisParameters& oa = p.objectiveAnalysisParameters;
  EXPECT_EQ(std::tuple(oa.ZeroCrossingDistance, oa.DecayDistance, oa.ErrorVariance, oa.MinData,
                       oa.MaxData),
            std::tuple(20000.0f, 8000.0f, 0.1f, -2.0f, 30.0f));
  EXPECT_EQ(std::tuple(oa.FilterOperations, oa.CorrelationSampleSize, oa.FilterType),
            std::tuple(2, 20, 1));
  EXPECT_EQ(std::string(p.outputData.FileName), d + "/result.nc");
  EXPECT_STREQ(p.outputData.Title, "Temperature, western Baltic");
  EXPECT_EQ(p.outputData.ItemType, 2);
}

// 'bilinear' and '12 pts filter' in any case, anything else the other choice.
TEST_F(ParameterReaderTest, AnalysisAndFilterTypeChoices) {
  struct Choice {
    bool analysis;  // else FilterType
    const char* value;
    int expected;
  };
  const Choice choices[] = {
      {true, "'BiLiNeAr'", 1},       {true, "Bilinear", 1},       {true, "'bilinear '", 0},
      {false, "'12 PTS FILTER'", 1}, {false, "'12pts filter'", 0}};
  const char* echoed[2][2] = {{"\t\tFilterType : shapiro \n", "\t\tFilterType : 12 pts filter \n"},
                              {"\t\tAnalysis : objective\n", "\t\tAnalysis : bilinear\n"}};
  for (const Choice& c : choices) {
    SCOPED_TRACE(c.value);
    const std::string from = c.analysis ? "Analysis = 'objective'" : "FilterType = '12 pts filter'";
    ASSERT_EQ(read(with(kComplete, from, from.substr(0, from.find('=') + 2) + c.value)), 1) << log_;
    EXPECT_EQ(c.analysis ? runParameters.calculationParameters.Analysis
                         : runParameters.objectiveAnalysisParameters.FilterType,
              c.expected);
    EXPECT_NE(log_.find(echoed[c.analysis][c.expected]), std::string::npos) << log_;
  }
}

// A failure stops the reading with the cause on one line, after the echo of
// the sections read completely before it (none for a file that is not read).
TEST_F(ParameterReaderTest, FailuresKeepTheEchoBeforeThemAndNameTheCause) {
  struct Case {
    std::string from, to;  // the change to kComplete
    std::string needle;    // the line the cause names
    std::string reason;
    int parts;  // echo parts before the cause
  };
  const std::string end = "EndSect  // Q4", target = "[Q4_DIGITIZING_OF_DATA]";
  const Case cases[] = {
      {target, "[Q4_DIGITIZING]", end, "target [Q4_DIGITIZING_OF_DATA] not found", 0},
      // Section names are case-sensitive.
      {"[DESCRIPTION_OF_GRID]", "[Description_Of_Grid]", end,
       "section [DESCRIPTION_OF_GRID] not found in " + target, 2},
      // Missing keywords and values of the wrong kind or size.
      {"      Projection = 'UTM-32'\n", "", "EndSect  // INPUT_FILES",
       "keyword Projection not found in section [INPUT_FILES]", 1},
      {"Projection = 'UTM-32'", "Projection = 32", "Projection",
       "keyword Projection: parameter 1 (the number 32) is not a text", 1},
      {"DataFileName = |./observations.txt|", "DataFileName = 'observations.txt'", "DataFileName",
       "keyword DataFileName: parameter 1 (the text 'observations.txt') is not a file name "
       "between | |", 1},
      {"ZRange = 0, 19", "ZRange = 0", "ZRange", "keyword ZRange has 1 value, 2 expected", 2},
      {"FilterOperations = 2", "FilterOperations = 2.5", "FilterOperations",
       "keyword FilterOperations: parameter 1 (the number 2.5) is not an integer", 4},
      {"ErrorVariance = 0.1", "ErrorVariance = 1e39", "ErrorVariance",
       "keyword ErrorVariance: parameter 1 (the number 1e39) is not a number within the float "
       "range", 4},
      {"ItemType = 2", "ItemType = 4294967298", "ItemType",
       "keyword ItemType: parameter 1 (the number 4294967298) is not an integer within 32 bits",
       5},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.from + " -> " + c.to);
    const std::string text = with(kComplete, c.from, c.to);
    EXPECT_EQ(read(text), 0);
    EXPECT_EQ(log_, echo(dir_.path(), c.parts) + where(text, c.needle) + c.reason + "\n");
  }

  // A bilinear run needs the objective-analysis section all the same.
  const std::string bilinear = with(with(kComplete, "'objective'", "'bilinear'"),
                                    "[OBJECTIVE_ANALYSIS_PARAMETERS]", "[OBJECTIVE]");
  EXPECT_EQ(read(bilinear), 0);
  EXPECT_EQ(log_, with(echo(dir_.path(), 4), "objective", "bilinear") + where(bilinear, end) +
                      "section [OBJECTIVE_ANALYSIS_PARAMETERS] not found in " + target + "\n");

  // Values read before the failing keyword are stored, later ones are not.
  ASSERT_EQ(read(with(kComplete, "FilterOperations = 2", "FilterOperations = x")), 0);
  const ObjectiveAnalysisParameters& oa = runParameters.objectiveAnalysisParameters;
  EXPECT_EQ(std::tuple(runParameters.gridDescription.ZRange[1], oa.MaxData, oa.FilterOperations,
                       oa.CorrelationSampleSize),
            std::tuple(19, 30.0f, 0, 0));
}

// Without a log stream nothing is echoed, but the values are read all the same.
TEST_F(ParameterReaderTest, OnlyTheFirstOccurrenceCountsExtrasAreIgnoredNoLogIsNeeded) {
  const std::string text =
      with(with(kComplete, "      Spacing = 2.5\n",
                "      Spacing = 3.5, 99\n      Spacing = 7\n      Unknown = 'x'\n"),
           "   [OUTPUT_DATA]\n", "   [EXTRA]\n      A = 1\n   EndSect\n   [OUTPUT_DATA]\n");
  logSetStream(nullptr);
  ASSERT_EQ(readParameterFile(dir_.write("quiet.pfs", text).c_str(), runParameters), 1);
  EXPECT_EQ(runParameters.gridDescription.Spacing, 3.5f);
}

TEST_F(ParameterReaderTest, TextLengthLimits) {
  const std::string name259 = "/" + std::string(258, 'a');
  ASSERT_EQ(read(with(kComplete, "|./bathymetry.nc|", "|" + name259 + "|")), 1) << log_;
  EXPECT_EQ(std::string(runParameters.inputFiles.FileName), name259);

  // A longer name is refused rather than cut to the name of another file.
  const std::string text = with(kComplete, "|./result.nc|", "|" + name259 + "b|");
  EXPECT_EQ(read(text), 0);
  EXPECT_NE(log_.find(where(text, "FileName = |/aaa") +
                      "keyword FileName: the value has 260 characters, at most 259 are allowed\n"),
            std::string::npos)
      << log_;

  // The title is only shown: a long one is cut, never inside a UTF-8 character.
  std::string title;
  for (int i = 0; i < 150; ++i) title += "\xC3\xA9";  // 300 bytes
  ASSERT_EQ(read(with(kComplete, "'Temperature, western Baltic'", "'" + title + "'")), 1) << log_;
  EXPECT_EQ(std::string(runParameters.outputData.Title), title.substr(0, 258));
}

}  // namespace
}  // namespace karnet
