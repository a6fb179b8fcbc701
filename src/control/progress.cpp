// Progress reporting to the host: phase texts, percentage, time left, speed
// and the cancel question.
#include "control/progress.h"

#include <chrono>
#include <cmath>
#include <ctime>

#include "control/host.h"
#include "control/ranks.h"
#include "control/signals.h"
#include "support/run_error.h"

namespace karnet {
namespace {

std::int64_t systemClock() { return static_cast<std::int64_t>(std::time(nullptr)); }

// The one active count; a new start replaces it.
struct ProgressCount {
  std::int64_t total = 0;
  std::int64_t startTime = 0;
  std::int64_t firstExtent = 0;
  std::int64_t secondExtent = 0;
  ProgressClock clock = systemClock;
};

ProgressCount count;

// Truncation toward zero into an int; values without a finite meaning give 0
// and values beyond the int range saturate.
int truncateToInt(double value) {
  if (!std::isfinite(value)) return 0;
  if (value >= 2147483647.0) return 2147483647;
  if (value <= -2147483648.0) return -2147483647 - 1;
  return static_cast<int>(value);
}

}  // namespace

void progressSetClock(ProgressClock clock) { count.clock = clock != nullptr ? clock : systemClock; }

void progressStatus(const char* text) { apvStatus(text); }

void progressStart(std::int64_t total) {
  count.total = total;
  count.startTime = count.clock();
}

void progressReport(std::int64_t done) {
  const auto elapsed = static_cast<std::int32_t>(count.clock() - count.startTime);
  // Without a total or without a whole elapsed second the fraction, speed and
  // time left have no finite value; the host then gets 0 for them.
  const double fraction =
      count.total != 0 ? static_cast<double>(done) / static_cast<double>(count.total) : 0.0;
  apvProgress(truncateToInt(fraction * 100.0));
  const double speed = elapsed != 0 ? static_cast<double>(done) / elapsed : 0.0;
  const double timeLeft =
      speed != 0.0 ? static_cast<double>(count.total - done) / speed : 0.0;
  apvTimeLeft(truncateToInt(timeLeft));
  apvSpeed(truncateToInt(speed));
  progressCheckCancel();
}

int progressCheckCancel() {
  handlePendingSignal();
  // In a run over several processes, the end of another (its error, a signal
  // sent to it, a cancel) reaches this one here; it then ends the same way.
  ranksCheckEnd();
  if (apvCancel() != 0) throw RunError::cancelled();
  return 0;
}

void progressStartGrid(std::int32_t e1, std::int32_t e2, std::int32_t e3) {
  count.firstExtent = e1;
  count.secondExtent = e2;
  progressStart(std::int64_t{e1} * (std::int64_t{e2} * (std::int64_t{e3} + 1) + 1));
}

void progressReportGrid(std::int32_t i, std::int32_t j, std::int32_t k) {
  progressReport((count.firstExtent * k + i) * count.secondExtent + j + 1);
}

WorkProgress::WorkProgress(std::int64_t total, std::int64_t done)
    : done_(done), driver_(std::this_thread::get_id()) {
  progressStart(total);
}

void WorkProgress::fail(std::exception_ptr error, std::int64_t order) {
  while (errorLock_.test_and_set(std::memory_order_acquire)) {
  }
  if (error_ == nullptr || order < errorOrder_) {
    error_ = error;
    errorOrder_ = order;
  }
  errorLock_.clear(std::memory_order_release);
  stop_.store(true, std::memory_order_relaxed);
}

void WorkProgress::poll() {
  if (std::this_thread::get_id() != driver_ || stopped()) return;
  try {
    progressReport(done_.load(std::memory_order_relaxed));
  } catch (...) {
    // A cancel or an interrupt comes before any error a worker may still meet.
    fail(std::current_exception(), INT64_MIN);
  }
}

void WorkProgress::watchUntilDone(std::int64_t items) {
  if (std::this_thread::get_id() != driver_) return;
  while (items_.load(std::memory_order_relaxed) < items) {
    poll();
    std::this_thread::sleep_for(std::chrono::milliseconds(20));
  }
}

void WorkProgress::finish() {
  if (error_ != nullptr) std::rethrow_exception(error_);
}

}  // namespace karnet
