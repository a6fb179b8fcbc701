#ifndef KARNET_CONTROL_PROGRESS_H_
#define KARNET_CONTROL_PROGRESS_H_

#include <cstdint>

namespace karnet {

// Thin layer through which the computation reports its phase, its percentage,
// time left and speed to the progress host, and asks whether to cancel.
void progressStatus(const char* text);
void progressStart(std::int64_t total);
void progressReport(std::int64_t done);
// 0, or ends the run with "Cancel computation" and exit code 0 when a cancel was
// asked for. Also runs the fatal path of an interrupt recorded since the last call.
int progressCheckCancel();
void progressStartGrid(std::int32_t e1, std::int32_t e2, std::int32_t e3);
void progressReportGrid(std::int32_t i, std::int32_t j, std::int32_t k);

// The calendar clock in whole seconds that the reports measure against
// (time() by default). Tests put a fake clock here; null restores time().
using ProgressClock = std::int64_t (*)();
void progressSetClock(ProgressClock clock);

}  // namespace karnet

#endif  // KARNET_CONTROL_PROGRESS_H_
