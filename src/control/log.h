#ifndef KARNET_CONTROL_LOG_H_
#define KARNET_CONTROL_LOG_H_

#include <cstdio>
#include <string>
#include <string_view>

namespace karnet {

// The run's report stream: the log file beside the parameter file, stderr when
// that cannot be created, null before main sets it and after the run ended.
extern std::FILE* logStream;

void logSetStream(std::FILE* stream);
// Writes text unchanged; appends "\n" only when text holds no newline at all.
void logWrite(const char* text);
// printf-style write to the log stream (nothing when it is null), no newline rule.
void logPrintf(const char* format, ...) __attribute__((format(printf, 1, 2)));
// Closes the log (releasing a held one first).
void logClose();

// A log file opened without emptying it, because it might yet turn out to be
// one of the run's inputs (a data file named like the log): until logRelease
// or logDiscardHeld the lines go to memory and the file is not touched.
void logHold(std::FILE* file);
// Empties the held log file and writes the lines held so far; the log goes
// on there.
void logRelease();
// Leaves the held log file as it was and closes it; the lines held so far and
// all later ones go to the standard error stream.
void logDiscardHeld();

// Where the phases send their report lines. The run's log is one sink; a
// ReportBuffer collects the lines of work done on other threads, which the
// driving thread then passes on in a fixed order.
class Report {
 public:
  virtual ~Report() = default;
  // The text exactly as given.
  virtual void put(std::string_view text) = 0;
  // The log's newline rule: "\n" is added when text holds no newline at all.
  void write(const char* text);
  void printf(const char* format, ...) __attribute__((format(printf, 2, 3)));
};

// The run's log stream (logStream as it is at each write).
class LogReport final : public Report {
 public:
  void put(std::string_view text) override;
};

class ReportBuffer final : public Report {
 public:
  void put(std::string_view text) override { text_ += text; }
  const std::string& text() const { return text_; }
  void passTo(Report& report) const {
    if (!text_.empty()) report.put(text_);
  }

 private:
  std::string text_;
};

// The report sink of the run's log.
Report& runLog();

}  // namespace karnet

#endif  // KARNET_CONTROL_LOG_H_
