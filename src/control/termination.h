#ifndef KARNET_CONTROL_TERMINATION_H_
#define KARNET_CONTROL_TERMINATION_H_

#include <cstddef>
#include <cstdint>

#include "support/run_error.h"

namespace karnet {

// The RUN TIME INFORMATION block: "Successful" for code 0, else "Abnormal".
void runTimeReport(std::int32_t completionCode);

// Report, close the log and end the process with the code. Never returns.
[[noreturn]] void exitRun(std::int32_t exitCode);

// Log the message, show it unless buildmode=nigth (or H84 unset), then
// exitRun with *exitCode, or 1 when exitCode is null.
[[noreturn]] void fatalError(const char* message, const std::int32_t* exitCode = nullptr);

// Ends the run for an error that reached the run driver: the error's log
// text, message or stderr text, then exitRun with its code. Only the driver
// (and the program's entry) calls it.
[[noreturn]] void endRun(const RunError& error);

// The same fatal path for use inside a signal handler: nothing but the log
// lines, the message, the terminal restore and _exit(exitCode), so that no
// exit handlers or destructors run in the signal context.
[[noreturn]] void fatalErrorInSignal(const char* message, std::int32_t exitCode);

// True once exitRun or one of the fatal paths has started to end the process.
bool runEnding();

// "CAPTION: MESSAGE" on stderr (plain mode) or through the progress host (apv mode).
int showMessage(const char* text);

// The running program's base name (no directory, no extension) into buffer.
void moduleBaseName(char* buffer, std::size_t size);

}  // namespace karnet

#endif  // KARNET_CONTROL_TERMINATION_H_
