#ifndef KARNET_CONTROL_SIGNALS_H_
#define KARNET_CONTROL_SIGNALS_H_

namespace karnet {

// Handlers for SIGFPE, SIGILL, SIGINT, SIGSEGV and SIGTERM that end the run
// through the fatal path with the signal's message and the signal number as
// exit code.
//
// SIGFPE, SIGILL and SIGSEGV end the run from the handler itself (the faulting
// code cannot go on). SIGINT and SIGTERM only record the signal: the fatal path
// runs outside the signal context at the next handlePendingSignal, which the
// computing loops reach through progressCheckCancel. Should the program not get
// there within about a second (a long read or write), a one-shot SIGALRM timer
// armed by the handler runs the fatal path from the signal context instead. A
// second SIGINT or SIGTERM while one is pending does the same at once.
void installSignalHandlers();
// Runs a still pending interrupt first, then puts the saved handlers back.
void restoreSignalHandlers();

// Runs the fatal path for an interrupt that a handler recorded, if any.
void handlePendingSignal();

}  // namespace karnet

#endif  // KARNET_CONTROL_SIGNALS_H_
