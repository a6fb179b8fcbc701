// The observation file's line reader and number parser.
#include "input/observation_line.h"

#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <cstdio>
#include <map>
#include <mutex>
#include <random>
#include <string>
#include <utility>
#include <vector>

namespace karnet {
namespace {

// What readObservationLines makes of text: the outcome and every stored
// line's numbers by index (each index must come once).
struct Read {
  ObservationLinesRead result;
  std::map<std::int64_t, std::array<double, 4>> stored;
  int blocks = 0;
};

Read readAll(const std::string& text, std::int64_t limit, int threads, std::size_t block) {
  Read read;
  std::FILE* file = text.empty() ? std::fopen("/dev/null", "rb")
                                 : fmemopen(const_cast<char*>(text.data()), text.size(), "rb");
  std::mutex guard;
  read.result = readObservationLines(
      file, limit, threads, block,
      [&](std::int64_t i, const double* v) {
        const std::lock_guard<std::mutex> lock(guard);
        EXPECT_TRUE(read.stored.emplace(i, std::array<double, 4>{v[0], v[1], v[2], v[3]}).second)
            << "line " << i << " stored twice";
      },
      [&] { ++read.blocks; });
  std::fclose(file);
  return read;
}

constexpr std::size_t kBlocks[] = {1, 7, 64, 1 << 20};

TEST(ObservationLines, EveryLineIsStoredOnceAtItsIndexWhateverTheBlocksAndThreads) {
  std::mt19937 random(3);
  std::string text;
  std::vector<std::array<double, 4>> expected;
  for (int i = 0; i < 300; ++i) {
    std::array<double, 4> v;
    for (double& x : v) x = static_cast<double>(static_cast<int>(random() % 20001) - 10000) / 8;
    char line[128];
    std::snprintf(line, sizeof line, "%s%.17g %.17g\t%.17g %.17g%s", i % 7 == 0 ? "  " : "", v[0], v[1], v[2],
                  v[3], i % 5 == 0 ? " trailing words\r" : "");
    text += line;
    if (i < 299) text += '\n';  // the last line has no line feed
    expected.push_back(v);
  }
  for (const std::size_t block : kBlocks) {
    for (const int threads : {1, 3}) {
      SCOPED_TRACE("block " + std::to_string(block) + " threads " + std::to_string(threads));
      const Read read = readAll(text, 300, threads, block);
      EXPECT_EQ(read.result.stop, ObservationLinesRead::Stop::kEnd);
      EXPECT_EQ(read.result.lines, 300);
      ASSERT_EQ(read.stored.size(), 300u);
      for (int i = 0; i < 300; ++i) EXPECT_EQ(read.stored.at(i), expected[i]) << "line " << i;
      if (block == 1 << 20) {
        EXPECT_EQ(read.blocks, 1);
      }
    }
  }
  EXPECT_EQ(readAll("", 5, 2, 64).result.lines, 0);
  EXPECT_EQ(readAll("1 2 3 4\n", 5, 2, 64).result.lines, 1);  // a final line feed ends no line
}

TEST(ObservationLines, TheFirstUnusableLineInFileOrderStopsTheRead) {
  auto lines = [](int count) {
    std::string text;
    for (int i = 0; i < count; ++i) text += std::to_string(i) + " 2 3 4\n";
    return text;
  };
  using Stop = ObservationLinesRead::Stop;
  // A NUL byte keeps its line's end: "1500 2500" and "-2 4" are not one
  // observation, and the line after it is line 12, not a part of line 11.
  const std::string withNul =
      lines(11) + std::string("1500 2500\0 x\n-2 4 5 6\n", 22) + lines(20) + "bad line\n";
  const std::string badLater = lines(40) + "1 2 x 4\n" + lines(3);
  const std::string longBlank = std::string(100000, ' ') + "\n1 2 3 4\n";
  for (const std::size_t block : kBlocks) {
    for (const int threads : {1, 3}) {
      SCOPED_TRACE("block " + std::to_string(block) + " threads " + std::to_string(threads));
      Read read = readAll(withNul, 1000, threads, block);
      EXPECT_EQ(read.result.stop, Stop::kNulByte);
      EXPECT_EQ(read.result.lines, 11);
      for (int i = 0; i < 11; ++i) EXPECT_EQ(read.stored.count(i), 1u) << i;

      read = readAll(badLater, 1000, threads, block);
      EXPECT_EQ(read.result.stop, Stop::kUnreadable);
      EXPECT_EQ(read.result.lines, 40);
      EXPECT_EQ(read.result.stopLine, "1 2 x 4");

      // More readable lines than the limit: stop at the first beyond it; an
      // unreadable line before the limit is named first.
      read = readAll(lines(50), 30, threads, block);
      EXPECT_EQ(read.result.stop, Stop::kBeyondLimit);
      EXPECT_EQ(read.result.lines, 30);
      EXPECT_EQ(readAll(badLater, 20, threads, block).result.stop, Stop::kBeyondLimit);
      EXPECT_EQ(readAll(badLater, 41, threads, block).result.stop, Stop::kUnreadable);

      read = readAll(longBlank, 10, threads, block);
      EXPECT_EQ(read.result.stop, Stop::kUnreadable);
      EXPECT_EQ(read.result.lines, 0);
      EXPECT_EQ(read.result.stopLine.size(), 100000u);
    }
  }
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
