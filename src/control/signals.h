#ifndef KARNET_CONTROL_SIGNALS_H_
#define KARNET_CONTROL_SIGNALS_H_

namespace karnet {

// Handlers for SIGFPE, SIGILL, SIGINT, SIGSEGV and SIGTERM that end the run
// through the fatal path with the signal's message and the signal number as
// exit code.
//
// SIGFPE, SIGILL and SIGSEGV end the run from the handler itself (the faulting
// code cannot go on). SIGINT and SIGTERM only record the signal: the fatal path
// runs outside the signal context: the next handlePendingSignal, which the
// computing loops reach through progressCheckCancel, throws the signal's
// RunError for the run driver. Should the program not get
// there within about a second (a long read or write), a one-shot SIGALRM timer
// armed by the handler runs the fatal path from the signal context instead. A
// second SIGINT or SIGTERM while one is pending does the same at once.
void installSignalHandlers();
// Puts the saved handlers back; throws the RunError of a still pending
// interrupt first.
void restoreSignalHandlers();

// Throws RunError::fatal with the message and number of an interrupt that a
// handler recorded, if any (once).
void handlePendingSignal();

}  // namespace karnet

#endif  // KARNET_CONTROL_SIGNALS_H_
