// The observation file's line reader and number parser.
#include "input/observation_line.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstdio>
#include <string>
#include <utility>
#include <vector>

namespace karnet {
namespace {

// Every line of text as the reader gives it, with what it reported.
std::vector<std::pair<LineRead, std::string>> readAll(const std::string& text) {
  std::vector<std::pair<LineRead, std::string>> lines;
  std::FILE* file = text.empty() ? std::fopen("/dev/null", "rb")
                                 : fmemopen(const_cast<char*>(text.data()), text.size(), "rb");
  std::string line;
  for (LineRead got; (got = readObservationLine(file, line)) != LineRead::kEnd;) {
    lines.emplace_back(got, line);
  }
  std::fclose(file);
  return lines;
}

TEST(ObservationLine, LinesAreSplitAtLineFeedsOnly) {
  using L = std::vector<std::pair<LineRead, std::string>>;
  EXPECT_EQ(readAll(""), L{});
  EXPECT_EQ(readAll("1 2 3 4"), (L{{LineRead::kLine, "1 2 3 4"}}));
  EXPECT_EQ(readAll("a\n\nb\r\n"),
            (L{{LineRead::kLine, "a"}, {LineRead::kLine, ""}, {LineRead::kLine, "b\r"}}));
  // Lines far longer than the read buffer come back whole.
  const std::string longLine(100000, 'x');
  EXPECT_EQ(readAll(longLine + "\nend"),
            (L{{LineRead::kLine, longLine}, {LineRead::kLine, "end"}}));
}

TEST(ObservationLine, ANulByteIsReportedAndKeepsTheLineEnd) {
  using L = std::vector<std::pair<LineRead, std::string>>;
  // Before, the bytes after a NUL were dropped together with the line feed, so
  // "1500 2500" and the next line "-2 4" read as one valid observation.
  EXPECT_EQ(readAll(std::string("1500 2500\0 x\n-2 4\n", 18)),
            (L{{LineRead::kNulByte, "1500 2500"}, {LineRead::kLine, "-2 4"}}));
  const std::string late = std::string(5000, ' ') + std::string(1, '\0') + "\nnext";
  EXPECT_EQ(readAll(late),
            (L{{LineRead::kNulByte, std::string(5000, ' ')}, {LineRead::kLine, "next"}}));
}

TEST(ObservationLine, FourFiniteNumbersAreAnObservation) {
  double v[4];
  ASSERT_TRUE(parseObservation(" 1.5\t-2e3 -7 0.25 trailing text 9", v));
  EXPECT_EQ(v[0], 1.5);
  EXPECT_EQ(v[1], -2000.0);
  EXPECT_EQ(v[2], -7.0);
  EXPECT_EQ(v[3], 0.25);
  ASSERT_TRUE(parseObservation("1e308 -1e308 0 1\r", v));
  EXPECT_EQ(v[0], 1e308);
  for (const char* bad : {"", "1 2 3", "1 2 3 x", "x 1 2 3", "1 2 3 inf", "nan 1 2 3",
                          "1 1e999 2 3", "1 2 -infinity 3"}) {
    SCOPED_TRACE(bad);
    EXPECT_FALSE(parseObservation(bad, v));
  }
}

}  // namespace
}  // namespace karnet
