#include <gtest/gtest.h>
// GCC 12 warns wrongly (-Wrestrict) about std::string concatenation inlined in these tests.
#pragma GCC diagnostic ignored "-Wrestrict"

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <string>

#include "control/log.h"
#include "par_test_util.h"
#include "params/run_parameters.h"

namespace karnet {
namespace {

using test::TempDir;

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

const std::string kRule =
    "======================================================================\n";

// The echo of each section of kComplete read from directory dir.
std::string echoTarget() { return kRule + "TARGET: Q4_DIGITIZING_OF_DATA\n"; }
std::string echoInputFiles(const std::string& dir) {
  return "\tsection: INPUT_FILES ---------------------------------\n"
         "\t\tFileName : " + dir + "/bathymetry.nc\n"
         "\t\tDataFileName : " + dir + "/observations.txt\n"
         "\t\tProjection: UTM-32\n";
}
const std::string kEchoGrid =
    "\tsection : DESCRIPTION_OF_GRID ------------------------\n"
    "\t\tZRange : 0, 19\n"
    "\t\tSpacing : 2.500000\n";
const std::string kEchoCalculation =
    "\tsection : CALCULATION_PARAMETERS ---------------------\n"
    "\t\tSearchRadius: 5000.000000\n"
    "\t\tMaxExtrapolationDistance : 10.000000, 20.000000\n"
    "\t\tAnalysis : objective\n";
const std::string kEchoObjective =
    "\tsection : OBJECTIVE_ANALYSIS_PARAMETERS --------------\n"
    "\t\tZeroCrossingDistance: 20000.000000\n"
    "\t\tDecayDistance : 8000.000000\n"
    "\t\tErrorVariance : 0.100000\n"
    "\t\tMinData : -2.000000\n"
    "\t\tMaxData : 30.000000\n"
    "\t\tFilterOperations : 2\n"
    "\t\tCorrelationSampleSize : 20\n"
    "\t\tFilterType : 12 pts filter \n";
std::string echoOutput(const std::string& dir) {
  return "\tsection : OUTPUT_DATA --------------------------------\n"
         "\t\tFileName : " + dir + "/result.nc\n"
         "\t\tTitle : Temperature, western Baltic\n"
         "\t\tItemType : 2\n" + kRule;
}

// text with the first occurrence of from replaced by to.
std::string with(std::string text, const std::string& from, const std::string& to) {
  const std::size_t at = text.find(from);
  EXPECT_NE(at, std::string::npos) << from;
  if (at != std::string::npos) text.replace(at, from.size(), to);
  return text;
}

// text without the block [name] ... EndSect  // name.
std::string without(const std::string& text, const std::string& name) {
  const std::size_t from = text.find("   [" + name + "]\n");
  const std::string end = "EndSect  // " + name + "\n";
  const std::size_t to = text.find(end);
  EXPECT_TRUE(from != std::string::npos && to != std::string::npos) << name;
  if (from == std::string::npos || to == std::string::npos) return text;
  return text.substr(0, from) + text.substr(to + end.size());
}

// The 1-based line of the first line of text that contains needle.
int lineOf(const std::string& text, const std::string& needle) {
  const std::size_t at = text.find(needle);
  EXPECT_NE(at, std::string::npos) << needle;
  return 1 + static_cast<int>(std::count(text.begin(), text.begin() + static_cast<long>(at), '\n'));
}

// Runs readParameterFile with the log going to a temporary file.
class ParameterReaderTest : public ::testing::Test {
 protected:
  int read(const std::string& text, const std::string& name = "run.pfs") {
    return readPath(dir_.write(name, text));
  }

  int readPath(const std::string& path) {
    std::FILE* stream = std::tmpfile();
    EXPECT_NE(stream, nullptr);
    logSetStream(stream);
    const int result = readParameterFile(path.c_str());
    logSetStream(nullptr);
    log_.clear();
    std::rewind(stream);
    char buffer[4096];
    std::size_t n;
    while ((n = std::fread(buffer, 1, sizeof buffer, stream)) > 0) log_.append(buffer, n);
    std::fclose(stream);
    return result;
  }

  TempDir dir_;
  std::string log_;
};

TEST_F(ParameterReaderTest, CompleteFileIsReadAndEchoedExactly) {
  ASSERT_EQ(read(kComplete), 1) << log_;
  const std::string& d = dir_.path();
  EXPECT_EQ(log_, echoTarget() + echoInputFiles(d) + kEchoGrid + kEchoCalculation +
                      kEchoObjective + echoOutput(d));

  // Every section header line is 56 characters with its tab and newline.
  int headers = 0;
  for (std::size_t at = log_.find("\tsection"); at != std::string::npos;
       at = log_.find("\tsection", at + 1)) {
    EXPECT_EQ(log_.find('\n', at) + 1 - at, 56u) << log_.substr(at, 60);
    ++headers;
  }
  EXPECT_EQ(headers, 5);

  const RunParameters& p = runParameters;
  EXPECT_EQ(std::string(p.inputFiles.DataFileName), d + "/observations.txt");
  EXPECT_EQ(std::string(p.inputFiles.FileName), d + "/bathymetry.nc");
  EXPECT_STREQ(p.inputFiles.Projection, "UTM-32");
  EXPECT_EQ(p.gridDescription.ZRange[0], 0);
  EXPECT_EQ(p.gridDescription.ZRange[1], 19);
  EXPECT_EQ(p.gridDescription.Spacing, 2.5f);
  EXPECT_EQ(p.calculationParameters.SearchRadius, 5000.0f);
  EXPECT_EQ(p.calculationParameters.MaxExtrapolationDistance[0], 10.0f);
  EXPECT_EQ(p.calculationParameters.MaxExtrapolationDistance[1], 20.0f);
  EXPECT_EQ(p.calculationParameters.Analysis, 0);
  const ObjectiveAnalysisParameters& oa = p.objectiveAnalysisParameters;
  EXPECT_EQ(oa.ZeroCrossingDistance, 20000.0f);
  EXPECT_EQ(oa.DecayDistance, 8000.0f);
  EXPECT_EQ(oa.ErrorVariance, 0.1f);
  EXPECT_EQ(oa.MinData, -2.0f);
  EXPECT_EQ(oa.MaxData, 30.0f);
  EXPECT_EQ(oa.FilterOperations, 2);
  EXPECT_EQ(oa.CorrelationSampleSize, 20);
  EXPECT_EQ(oa.FilterType, 1);
  EXPECT_EQ(std::string(p.outputData.FileName), d + "/result.nc");
  EXPECT_STREQ(p.outputData.Title, "Temperature, western Baltic");
  EXPECT_EQ(p.outputData.ItemType, 2);
}

// Without a log stream nothing is echoed, but the values are read all the same.
TEST_F(ParameterReaderTest, ReadsWithoutALogStream) {
  logSetStream(nullptr);
  const std::string path = dir_.write("quiet.pfs", with(kComplete, "ItemType = 2", "ItemType = 7"));
  ASSERT_EQ(readParameterFile(path.c_str()), 1);
  EXPECT_EQ(runParameters.outputData.ItemType, 7);
  EXPECT_EQ(runParameters.objectiveAnalysisParameters.CorrelationSampleSize, 20);
}

TEST_F(ParameterReaderTest, AnalysisAndFilterTypeChoices) {
  struct Choice {
    const char* value;
    int expected;
  };
  const Choice analyses[] = {{"'bilinear'", 1}, {"'BILINEAR'", 1}, {"'BiLiNeAr'", 1},
                             {"bilinear", 1},   {"Bilinear", 1},   {"'objective'", 0},
                             {"''", 0},         {"'bilinear '", 0}, {"'bi linear'", 0},
                             {"'bilinearx'", 0}, {"shapiro", 0}};
  for (const Choice& c : analyses) {
    SCOPED_TRACE(c.value);
    ASSERT_EQ(read(with(kComplete, "Analysis = 'objective'",
                        std::string("Analysis = ") + c.value)),
              1)
        << log_;
    EXPECT_EQ(runParameters.calculationParameters.Analysis, c.expected);
    EXPECT_NE(log_.find(c.expected ? "\t\tAnalysis : bilinear\n" : "\t\tAnalysis : objective\n"),
              std::string::npos);
  }
  const Choice filters[] = {{"'12 pts filter'", 1}, {"'12 PTS FILTER'", 1}, {"'12 Pts Filter'", 1},
                            {"'shapiro'", 0},       {"shapiro", 0},         {"'12pts filter'", 0},
                            {"''", 0},              {"'12 pts  filter'", 0}};
  for (const Choice& c : filters) {
    SCOPED_TRACE(c.value);
    ASSERT_EQ(read(with(kComplete, "FilterType = '12 pts filter'",
                        std::string("FilterType = ") + c.value)),
              1)
        << log_;
    EXPECT_EQ(runParameters.objectiveAnalysisParameters.FilterType, c.expected);
    EXPECT_NE(log_.find(c.expected ? "\t\tFilterType : 12 pts filter \n"
                                   : "\t\tFilterType : shapiro \n"),
              std::string::npos);
  }
}

// A missing section stops the reading after the echo of the sections before
// it, with the cause on one line after them.
TEST_F(ParameterReaderTest, MissingSectionsKeepTheEchoBeforeThem) {
  const std::string& d = dir_.path();
  const std::string noOutput = without(kComplete, "OUTPUT_DATA");
  EXPECT_EQ(read(noOutput), 0);
  EXPECT_EQ(log_, echoTarget() + echoInputFiles(d) + kEchoGrid + kEchoCalculation +
                      kEchoObjective + "run.pfs:" + std::to_string(lineOf(noOutput, "EndSect  // Q4")) +
                      ": section [OUTPUT_DATA] not found in [Q4_DIGITIZING_OF_DATA]\n");
  // What was read before stays.
  EXPECT_EQ(runParameters.objectiveAnalysisParameters.CorrelationSampleSize, 20);
  EXPECT_EQ(runParameters.gridDescription.ZRange[1], 19);

  // A bilinear run needs the objective-analysis section all the same.
  const std::string bilinear =
      without(with(kComplete, "Analysis = 'objective'", "Analysis = 'bilinear'"),
              "OBJECTIVE_ANALYSIS_PARAMETERS");
  EXPECT_EQ(read(bilinear), 0);
  EXPECT_EQ(log_, echoTarget() + echoInputFiles(d) + kEchoGrid +
                      with(kEchoCalculation, "objective", "bilinear") + "run.pfs:" +
                      std::to_string(lineOf(bilinear, "EndSect  // Q4")) +
                      ": section [OBJECTIVE_ANALYSIS_PARAMETERS] not found in "
                      "[Q4_DIGITIZING_OF_DATA]\n");

  const std::string noInput = without(kComplete, "INPUT_FILES");
  EXPECT_EQ(read(noInput), 0);
  EXPECT_EQ(log_, echoTarget() + "run.pfs:" + std::to_string(lineOf(noInput, "EndSect  // Q4")) +
                      ": section [INPUT_FILES] not found in [Q4_DIGITIZING_OF_DATA]\n");

  // Section names are case-sensitive.
  EXPECT_EQ(read(with(kComplete, "[DESCRIPTION_OF_GRID]", "[Description_Of_Grid]")), 0);
  EXPECT_NE(log_.find("section [DESCRIPTION_OF_GRID] not found"), std::string::npos);
}

TEST_F(ParameterReaderTest, AnotherTargetFailsBeforeAnyEcho) {
  const std::string other = with(kComplete, "[Q4_DIGITIZING_OF_DATA]", "[Q4_DIGITIZING]");
  EXPECT_EQ(read(other), 0);
  EXPECT_EQ(log_, "run.pfs:" + std::to_string(lineOf(other, "EndSect  // Q4")) +
                      ": target [Q4_DIGITIZING_OF_DATA] not found\n");
  EXPECT_EQ(read(""), 0);
  EXPECT_EQ(log_, "run.pfs:1: target [Q4_DIGITIZING_OF_DATA] not found\n");
}

TEST_F(ParameterReaderTest, UnreadableAndMalformedFiles) {
  EXPECT_EQ(readPath(dir_.file("nothere.pfs")), 0);
  EXPECT_EQ(log_, "Can't open nothere.pfs\n");

  const std::string broken = with(kComplete, "Spacing = 2.5", "Spacing = 2.5 m");
  EXPECT_EQ(read(broken, "broken.pfs"), 0);
  EXPECT_EQ(log_, "broken.pfs:" + std::to_string(lineOf(broken, "Spacing")) +
                      ": expected ',' between the values of keyword Spacing, found 'm'\n");

  const std::string unclosed = kComplete.substr(0, kComplete.rfind("EndSect"));
  EXPECT_EQ(read(unclosed), 0);
  EXPECT_EQ(log_, "run.pfs:2: block Q4_DIGITIZING_OF_DATA is not closed (EndSect missing)\n");
}

// A missing keyword or a value of the wrong kind stops the reading; the values
// of the section read before it are kept, its echo is not written.
TEST_F(ParameterReaderTest, KeywordFailuresNameTheCause) {
  struct Case {
    std::string from, to;   // the change to kComplete
    std::string needle;     // the line the cause names
    std::string reason;
    int sectionsEchoed;     // complete sections before the failure
  };
  const Case cases[] = {
      {"      Projection = 'UTM-32'\n", "", "EndSect  // INPUT_FILES",
       "keyword Projection not found in section [INPUT_FILES]", 0},
      {"Projection = 'UTM-32'", "Projection = 32", "Projection",
       "keyword Projection: parameter 1 (the number 32) is not a text", 0},
      {"DataFileName = |./observations.txt|", "DataFileName = 'observations.txt'", "DataFileName",
       "keyword DataFileName: parameter 1 (the text 'observations.txt') is not a file name "
       "between | |", 0},
      {"ZRange = 0, 19", "ZRange = 0", "ZRange", "keyword ZRange has 1 value, 2 expected", 1},
      {"ZRange = 0, 19", "ZRange = 0, 19.5", "ZRange",
       "keyword ZRange: parameter 2 (the number 19.5) is not an integer", 1},
      {"Spacing = 2.5", "Spacing = 'wide'", "Spacing",
       "keyword Spacing: parameter 1 (the text 'wide') is not a number", 1},
      {"MaxExtrapolationDistance = 10, 20", "MaxExtrapolationDistance = 10, 20, 30",
       "MaxExtrapolationDistance", "keyword MaxExtrapolationDistance has 3 values, 2 expected", 2},
      {"Analysis = 'objective'", "Analysis = 1", "Analysis",
       "keyword Analysis: parameter 1 (the number 1) is not a text", 2},
      {"      DecayDistance = 8000\n", "", "EndSect  // OBJECTIVE",
       "keyword DecayDistance not found in section [OBJECTIVE_ANALYSIS_PARAMETERS]", 3},
      {"FilterOperations = 2", "FilterOperations = 2.5", "FilterOperations",
       "keyword FilterOperations: parameter 1 (the number 2.5) is not an integer", 3},
      {"CorrelationSampleSize = 20", "CorrelationSampleSize = 1e40", "CorrelationSampleSize",
       "keyword CorrelationSampleSize: parameter 1 (the number 1e40) is not an integer", 3},
      {"ErrorVariance = 0.1", "ErrorVariance = 1e39", "ErrorVariance",
       "keyword ErrorVariance: parameter 1 (the number 1e39) is not a number within the float "
       "range", 3},
      {"Title = 'Temperature, western Baltic'", "Title = |title.txt|", "Title",
       "keyword Title: parameter 1 (the file name |" + dir_.path() +
           "/title.txt|) is not a text", 4},
      {"ItemType = 2", "ItemType = 4294967298", "ItemType",
       "keyword ItemType: parameter 1 (the number 4294967298) is not an integer within 32 bits",
       4},
  };
  const std::string& d = dir_.path();
  const std::string echoes[] = {echoInputFiles(d), kEchoGrid, kEchoCalculation, kEchoObjective};
  for (const Case& c : cases) {
    SCOPED_TRACE(c.to);
    const std::string text = with(kComplete, c.from, c.to);
    EXPECT_EQ(read(text), 0);
    std::string expected = echoTarget();
    for (int s = 0; s < c.sectionsEchoed; ++s) expected += echoes[s];
    expected += "run.pfs:" + std::to_string(lineOf(text, c.needle)) + ": " + c.reason + "\n";
    EXPECT_EQ(log_, expected);
  }

  // Values read before the failing keyword are stored, later ones are not.
  ASSERT_EQ(read(with(kComplete, "FilterOperations = 2", "FilterOperations = x")), 0);
  const ObjectiveAnalysisParameters& oa = runParameters.objectiveAnalysisParameters;
  EXPECT_EQ(oa.MaxData, 30.0f);
  EXPECT_EQ(oa.FilterOperations, 0);
  EXPECT_EQ(oa.CorrelationSampleSize, 0);
}

TEST_F(ParameterReaderTest, OnlyTheFirstOccurrenceCountsAndExtrasAreIgnored) {
  const std::string text =
      with(with(kComplete, "      Spacing = 2.5\n",
                "      Spacing = 2.5, 99\n      Spacing = 7\n      Unknown = 'x'\n"),
           "   [OUTPUT_DATA]\n", "   [EXTRA]\n      A = 1\n   EndSect\n   [OUTPUT_DATA]\n");
  ASSERT_EQ(read(text), 1) << log_;
  EXPECT_EQ(runParameters.gridDescription.Spacing, 2.5f);
}

TEST_F(ParameterReaderTest, TextLengthLimits) {
  const std::string name259 = "/" + std::string(258, 'a');
  ASSERT_EQ(read(with(kComplete, "|./bathymetry.nc|", "|" + name259 + "|")), 1) << log_;
  EXPECT_EQ(std::string(runParameters.inputFiles.FileName), name259);

  // A longer name is refused rather than cut to the name of another file.
  const std::string text = with(kComplete, "|./result.nc|", "|" + name259 + "b|");
  EXPECT_EQ(read(text), 0);
  EXPECT_NE(log_.find("run.pfs:" + std::to_string(lineOf(text, "FileName = |/aaa")) +
                      ": keyword FileName: the value has 260 characters, at most 259 are "
                      "allowed\n"),
            std::string::npos)
      << log_;

  const std::string projection1023(1023, 'p');
  ASSERT_EQ(read(with(kComplete, "'UTM-32'", "'" + projection1023 + "'")), 1) << log_;
  EXPECT_EQ(std::string(runParameters.inputFiles.Projection), projection1023);
  EXPECT_EQ(read(with(kComplete, "'UTM-32'", "'" + projection1023 + "p'")), 0);
  EXPECT_NE(log_.find("keyword Projection: the value has 1024 characters, at most 1023"),
            std::string::npos);

  // The title is only shown: a long one is cut, never inside a UTF-8 character.
  std::string title;
  for (int i = 0; i < 150; ++i) title += "\xC3\xA9";  // 300 bytes
  ASSERT_EQ(read(with(kComplete, "'Temperature, western Baltic'", "'" + title + "'")), 1) << log_;
  EXPECT_EQ(std::string(runParameters.outputData.Title), title.substr(0, 258));
  ASSERT_EQ(read(with(kComplete, "'Temperature, western Baltic'", "'" + std::string(400, 't') + "'")),
            1);
  EXPECT_EQ(std::string(runParameters.outputData.Title), std::string(259, 't'));
}

}  // namespace
}  // namespace karnet
