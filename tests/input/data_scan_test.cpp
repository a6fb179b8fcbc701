// Laying the basic grid over the data and the local grid, one axis at a time.
#include <gtest/gtest.h>

#include <string>
#include <utility>
#include <vector>

#include "input/data_scan.h"

namespace karnet {
namespace {

TEST(BasicAxis, DataBelowTheLocalOriginExtendTheGridDownwardsDataAboveKeepIt) {
  const struct {
    const char* what;
    double dataMin, dataMax, localFirst;
    float spacing;
    std::int32_t localLast;
    double origin;
    std::int32_t offset;
    std::int64_t count;
    bool warning;
  } cases[] = {
      // Local nodes 0..10 from 100, spacing 10: an observation at 75 lies half a node
      // above the origin, one at 260 on node 19.
      {"data below the local origin", 75.0, 260.0, 100.0, 10.0f, 10, 70.0, 3, 21, false},
      // Levels 0..9 of 1 m: the deepest local level lies at -10.
      {"levels below the deepest local level", -14.2, 0.0, -10.0, 1.0f, 9, -15.0, 5, 17, false},
      {"data from the local origin", 100.0, 150.0, 100.0, 10.0f, 10, 100.0, 0, 12, false},
      // The local grid alone decides the size when the data end before it does.
      {"data above the local origin", 130.0, 150.0, 100.0, 10.0f, 10, 100.0, 0, 12, true},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    const BasicAxis a = layBasicAxis(c.dataMin, c.dataMax, c.localFirst, c.spacing, 0, c.localLast);
    EXPECT_DOUBLE_EQ(a.origin, c.origin);
    EXPECT_EQ(a.offset, c.offset);
    EXPECT_EQ(a.count, c.count);
    EXPECT_EQ(a.originWarning, c.warning);
  }
}

TEST(BasicAxis, TheLocalGridAlwaysFitsWithOneNodeToSpare) {
  // Spacings that are not powers of two round in float; the rule must still hold.
  for (float spacing : {0.3f, 1.0f, 2.5f, 7.1f, 250.0f}) {
    for (double dataMin : {-1000.0, -3.3, 0.0, 12.0}) {
      for (double dataMax : {-2.0, 40.0, 5000.0}) {
        for (int span : {0, 1, 9, 40}) {
          SCOPED_TRACE(testing::Message() << spacing << " " << dataMin << " " << dataMax
                                          << " " << span);
          const double localFirst = 11.0;
          const BasicAxis a = layBasicAxis(dataMin, dataMax, localFirst, spacing, 3, 3 + span);
          EXPECT_GE(a.count, a.offset + span + 2);
          EXPECT_GE(a.offset, 0);
          EXPECT_LE(a.origin, localFirst);
          if (dataMin < localFirst) {
            EXPECT_LT(a.origin, dataMin);
            EXPECT_GE(a.origin, dataMin - spacing * 1.000001);
          }
        }
      }
    }
  }
}

TEST(BasicAxis, HugeExtentsGiveCountsBeyondThirtyTwoBits) {
  // The caller refuses such a grid; the count itself must not wrap.
  const BasicAxis a = layBasicAxis(0.0, 1e12, 0.0, 1.0f, 0, 10);
  EXPECT_GT(a.count, std::int64_t{2147483647});
}

// What the user is told about an observation line that cannot be read.
TEST(ObservationLine, ProblemsNamed) {
  const std::vector<std::pair<const char*, std::string>> cases = {
      {"1 2 -3 4.5", ""},
      {"  1e3\t2 -3 4 trailing text", ""},
      {"1 2 -3 4\r", ""},
      {"", "empty line"},
      {" \t\r", "empty line"},
      {"lon lat z value", "not a number: \"lon\""},
      {"1 2 depth 4", "not a number: \"depth\""},
      {"1 2 -3", "4 numbers expected (x y z value), found 3"},
      {"1 2 -3 nan", "not a finite number: \"nan\""},
      {"1 inf -3 4", "not a finite number: \"inf\""},
      {"1 2 -3 1e999", "not a finite number: \"1e999\""},
  };
  for (const auto& [line, problem] : cases) {
    EXPECT_EQ(observationLineProblem(line), problem) << line;
  }
}

}  // namespace
}  // namespace karnet
