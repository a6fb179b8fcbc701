#ifndef KARNET_CONTROL_PROGRESS_H_
#define KARNET_CONTROL_PROGRESS_H_

#include <atomic>
#include <cstdint>
#include <exception>
#include <thread>

namespace karnet {

// Thin layer through which the computation reports its phase, its percentage,
// time left and speed to the progress host, and asks whether to cancel. The
// host is only ever called from the thread that drives the run.
void progressStatus(const char* text);
void progressStart(std::int64_t total);
// Shows done units of the current total, then asks for a cancel.
void progressReport(std::int64_t done);
// 0, or throws RunError::cancelled() when a cancel was asked for. First turns
// an interrupt recorded since the last call into its RunError.
int progressCheckCancel();
void progressStartGrid(std::int32_t e1, std::int32_t e2, std::int32_t e3);
void progressReportGrid(std::int32_t i, std::int32_t j, std::int32_t k);

// The calendar clock in whole seconds that the reports measure against
// (time() by default). Tests put a fake clock here; null restores time().
using ProgressClock = std::int64_t (*)();
void progressSetClock(ProgressClock clock);

// Progress and stopping of work shared out over threads. Workers add the
// units they have done to an atomic count and look at the stop flag between
// chunks of work; the thread that made the object (the one driving the run)
// shows the count and asks the host and the signal handlers whether to stop.
// A cancel or an interrupt found there, or an error of a worker, raises the
// stop flag; once the workers are done the driving thread rethrows it.
class WorkProgress {
 public:
  // Starts a count of total units (progressStart) with done units already done.
  explicit WorkProgress(std::int64_t total, std::int64_t done = 0);
  WorkProgress(const WorkProgress&) = delete;
  WorkProgress& operator=(const WorkProgress&) = delete;

  // Any thread.
  void add(std::int64_t units) { done_.fetch_add(units, std::memory_order_relaxed); }
  bool stopped() const { return stop_.load(std::memory_order_relaxed); }
  // Keeps the first error reported (with the lowest order, when several
  // workers fail) and raises the stop flag.
  void fail(std::exception_ptr error, std::int64_t order);

  // Shows the count and asks whether to stop; does nothing on other threads
  // than the driving one, so workers may call it between their chunks.
  void poll();
  // Any thread: one more item (a layer, say) finished or passed over.
  void itemDone() { items_.fetch_add(1, std::memory_order_relaxed); }
  // The driving thread, once it has no work of its own left: keeps polling
  // until `items` items are done, so that a cancel or an interrupt is seen
  // while other threads finish theirs. Returns at once on other threads.
  void watchUntilDone(std::int64_t items);
  // The driving thread, after the workers: rethrows what stopped the work.
  void finish();

 private:
  std::atomic<std::int64_t> done_;
  std::atomic<bool> stop_{false};
  std::atomic<std::int64_t> items_{0};
  std::thread::id driver_;
  std::atomic_flag errorLock_ = ATOMIC_FLAG_INIT;
  std::exception_ptr error_;
  std::int64_t errorOrder_ = 0;
};

}  // namespace karnet

#endif  // KARNET_CONTROL_PROGRESS_H_
