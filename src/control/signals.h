#ifndef KARNET_CONTROL_SIGNALS_H_
#define KARNET_CONTROL_SIGNALS_H_

namespace karnet {

// Handlers for SIGFPE, SIGILL, SIGINT, SIGSEGV and SIGTERM that end the run
// through fatalError with the signal's message and the signal number as exit code.
void installSignalHandlers();
void restoreSignalHandlers();

// Runs the fatal path for a signal that a handler recorded, if any. Long loops
// call it through progressCheckCancel so that the fatal path runs outside the
// signal context.
void handlePendingSignal();

}  // namespace karnet

#endif  // KARNET_CONTROL_SIGNALS_H_
