// The report stream: the newline rule, closing, and the run-time report block.
#include "control/log.h"

#include <fcntl.h>
#include <gtest/gtest.h>

#include <cstdio>
#include <ctime>
#include <functional>
#include <string>

#include "control/termination.h"

namespace karnet {
namespace {

// Everything fn writes to the log stream.
std::string logged(const std::function<void()>& fn) {
  std::FILE* file = std::tmpfile();
  logSetStream(file);
  fn();
  logSetStream(nullptr);
  std::fflush(file);
  std::rewind(file);
  std::string text;
  for (int c; (c = std::fgetc(file)) != EOF;) text.push_back(static_cast<char>(c));
  std::fclose(file);
  return text;
}

TEST(LogWriteTest, AppendsANewlineOnlyToTextsWithoutAny) {
  struct Case {
    const char* text;
    const char* written;
  };
  const Case cases[] = {
      {"Error in parameter file", "Error in parameter file\n"},
      {"done\n", "done\n"},
      {"first\nsecond", "first\nsecond"},
      {"\nERROR: x\n", "\nERROR: x\n"},
      {"\n", "\n"},
      {"", "\n"},
  };
  for (const Case& c : cases) {
    EXPECT_EQ(logged([&] { logWrite(c.text); }), c.written) << c.text;
  }
}

TEST(LogWriteTest, NothingHappensWithoutStreamOrText) {
  EXPECT_EQ(logged([] { logWrite(nullptr); }), "");
  logSetStream(nullptr);
  logWrite("dropped");
  logPrintf("%s", "dropped");
  logClose();
  EXPECT_EQ(logStream, nullptr);
}

TEST(LogWriteTest, PrintfWritesExactlyTheFormattedText) {
  EXPECT_EQ(logged([] { logPrintf("\nERROR: %s\n", "unable to open ASCII data file"); }),
            "\nERROR: unable to open ASCII data file\n");
  EXPECT_EQ(logged([] { logPrintf("%d:%.2f", 7, 0.5); }), "7:0.50");
}

TEST(LogCloseTest, ClosesTheLogFileAndForgetsIt) {
  char path[] = "/tmp/karnet_logXXXXXX";
  const int fd = mkstemp(path);
  ASSERT_GE(fd, 0);
  close(fd);
  logSetStream(std::fopen(path, "w"));
  logWrite("kept");
  logClose();
  EXPECT_EQ(logStream, nullptr);
  std::FILE* file = std::fopen(path, "r");
  char line[32] = "";
  ASSERT_NE(std::fgets(line, sizeof line, file), nullptr);
  EXPECT_STREQ(line, "kept\n");
  std::fclose(file);
  std::remove(path);
}

TEST(LogCloseTest, StandardErrorStandingInForTheLogStaysOpen) {
  logSetStream(stderr);
  logClose();
  EXPECT_EQ(logStream, nullptr);
  EXPECT_NE(fcntl(fileno(stderr), F_GETFD), -1);
  EXPECT_GE(std::fputs("", stderr), 0);
}

std::string reportBlock(const char* completion, long cpuSeconds) {
  return "\n"
         "--------------- RUN TIME INFORMATION --------------\n"
         "--\n"
         "-- CPU time        : " +
         std::to_string(cpuSeconds) +
         " [s]\n"
         "--\n"
         "-- Completion code : " +
         completion +
         "\n"
         "--\n"
         "---------------------------------------------------\n";
}

TEST(RunTimeReportTest, WritesTheBlockWithCompletionCode) {
  struct Case {
    std::int32_t code;
    const char* completion;
  };
  const Case cases[] = {{0, "Successful"}, {1, "Abnormal"}, {2, "Abnormal"}, {-1, "Abnormal"}};
  for (const Case& c : cases) {
    const long before = static_cast<long>(std::clock() / CLOCKS_PER_SEC);
    const std::string text = logged([&] { runTimeReport(c.code); });
    const long after = static_cast<long>(std::clock() / CLOCKS_PER_SEC);
    // The CPU time is whole seconds of processor time, between the two readings.
    bool matched = false;
    for (long seconds = before; seconds <= after; ++seconds) {
      matched = matched || text == reportBlock(c.completion, seconds);
    }
    EXPECT_TRUE(matched) << text;
  }
}

}  // namespace
}  // namespace karnet
