// Progress arithmetic (percentage, speed, time left) and the cancel request.
#include "control/progress.h"

#include <gtest/gtest.h>
#include <signal.h>

#include <string>

#include "child_process.h"
#include "control/host.h"
#include "control/log.h"

namespace karnet {
namespace {

using karnet::testing::ChildOutcome;
using karnet::testing::runChild;
using karnet::testing::TempFile;

std::int64_t fakeNow = 0;
std::int64_t fakeClock() { return fakeNow; }

class ProgressTest : public ::testing::Test {
 protected:
  void SetUp() override {
    fakeNow = 1'700'000'000;
    progressSetClock(fakeClock);
  }
  void TearDown() override { progressSetClock(nullptr); }

  static void expectShown(int percent, int timeLeft, int speed) {
    const HostDisplayState shown = apvDisplayState();
    EXPECT_EQ(shown.percent, percent);
    EXPECT_EQ(shown.timeLeft, timeLeft);
    EXPECT_EQ(shown.speed, speed);
  }
};

TEST_F(ProgressTest, ReportsPercentSpeedAndTimeLeftOfTheCurrentCount) {
  progressStart(200);
  fakeNow += 10;
  progressReport(50);
  expectShown(25, 30, 5);  // 50 units in 10 s: 5/s, 150 left

  fakeNow += 5;
  progressReport(199);  // 199/200 = 99.5 %, 13.27/s, 0.075 s left: all truncated
  expectShown(99, 0, 13);

  progressStart(3);  // a new count replaces the old one
  fakeNow += 2;
  progressReport(1);
  expectShown(33, 4, 0);
}

TEST_F(ProgressTest, GridCountsEveryNodeOfTheLocalGrid) {
  progressStartGrid(10, 20, 4);  // 10 * (20 * 5 + 1) = 1010 units
  fakeNow += 1;
  progressReportGrid(0, 0, 0);
  expectShown(0, 1009, 1);  // one unit done

  progressReportGrid(3, 5, 2);  // (10 * 2 + 3) * 20 + 5 + 1 = 466 units
  expectShown(46, 1, 466);

  progressReportGrid(10, 19, 4);  // (10 * 4 + 10) * 20 + 19 + 1 = 1020: past the total
  expectShown(100, 0, 1020);
}

TEST_F(ProgressTest, LargeGridsCountBeyondThirtyTwoBits) {
  progressStartGrid(100000, 100000, 10);  // 1.1e11 units
  fakeNow += 1000;
  progressReportGrid(99999, 99999, 10);
  // (1e5 * 10 + 99999) * 1e5 + 99999 + 1 = 110000000000 of 110000100000 units
  expectShown(99, 0, 110000000);
  progressReportGrid(0, 0, 5);  // 5e10 + 1 units
  EXPECT_EQ(apvDisplayState().percent, 45);
}

TEST_F(ProgressTest, WithoutElapsedTimeOrTotalNothingDividesByZero) {
  progressStart(100);
  progressReport(10);  // no whole second yet
  expectShown(10, 0, 0);

  progressStart(0);
  progressReport(0);
  expectShown(0, 0, 0);
  fakeNow += 4;
  progressReport(8);  // units done against a total of nothing
  expectShown(0, -4, 2);

  progressStart(5);
  progressReport(0);
  expectShown(0, 0, 0);
}

TEST_F(ProgressTest, StatusTextGoesToTheHost) {
  progressStatus("Scanning bathymetry ...");
  EXPECT_STREQ(apvDisplayState().status, "Scanning bathymetry ...");
  EXPECT_EQ(apvDisplayState().percent, -1);
}

TEST_F(ProgressTest, WithoutHostNoCancelIsEverAskedFor) {
  for (int i = 0; i < 3; ++i) EXPECT_EQ(progressCheckCancel(), 0);
}

std::string cancelLogPath;

int cancelledComputation() {
  logSetStream(std::fopen(cancelLogPath.c_str(), "w"));
  progressStatus("Interpolating ...");
  progressStart(100);
  progressReport(10);
  std::fputs("no cancel yet\n", stderr);
  raise(SIGUSR1);
  progressReport(20);
  _exit(99);
}

TEST(ProgressCancelTest, CancelFromTheHostEndsTheRunSuccessfully) {
  TempFile log;
  cancelLogPath = log.path();
  const ChildOutcome outcome = runChild([] {
    setenv("H84", "APV", 1);
    apvStart("karnet", cancelledComputation);
    _exit(98);
  });
  EXPECT_TRUE(outcome.exited);
  EXPECT_EQ(outcome.exitCode, 0);
  const std::size_t asked = outcome.output.find("no cancel yet\n");
  ASSERT_NE(asked, std::string::npos) << outcome.output;
  EXPECT_EQ(outcome.output.substr(outcome.output.size() - 20), "\nCancel computation\n")
      << outcome.output;
  EXPECT_EQ(log.contents(),
            "\n--------------- RUN TIME INFORMATION --------------\n--\n"
            "-- CPU time        : 0 [s]\n--\n-- Completion code : Successful\n--\n"
            "---------------------------------------------------\n");
}

}  // namespace
}  // namespace karnet
