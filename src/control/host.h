#ifndef KARNET_CONTROL_HOST_H_
#define KARNET_CONTROL_HOST_H_

namespace karnet {

// The progress host on a terminal. In plain mode (H84=WIN) the calls draw a
// progress line on stderr when it is a terminal and apvCancel gives 0; in host
// mode (//apv) apvStart runs the callback under a display and the user cancels
// with the key q (when stdin is a terminal) or SIGUSR1.
//
// Host mode display: on a terminal stderr one line rewritten in place (status
// text, bar, percentage, time left, speed); otherwise a plain line at each
// status text and at each tenth of the work. The terminal settings changed for
// reading keys are restored on every way the process ends.
int apvStart(const char* programName, int (*callback)());
int apvStatus(const char* text);
int apvProgress(int percent);
int apvTimeLeft(int seconds);
int apvSpeed(int unitsPerSecond);
// Non-zero once the user asked to cancel (host mode only; plain mode gives 0).
int apvCancel();
// Shows the text on a line of its own ("CAPTION: TEXT", or "TEXT" without a
// caption) on stderr; never waits for a key. The style is not used.
int apvMessage(const char* text, const char* caption, int style);

// The message line of apvMessage, for the plain-mode message box: moves an
// active progress line out of the way first.
void consoleMessage(const char* text, const char* caption);

// Restores the terminal and clears the progress line; safe to call any time,
// also from a signal handler, and more than once.
void apvShutdown();

// What the display holds now: the last status text, percentage, time left and
// speed that were passed to it (percent is -1 before the first report).
struct HostDisplayState {
  const char* status;
  int percent;
  int timeLeft;
  int speed;
};
HostDisplayState apvDisplayState();

}  // namespace karnet

#endif  // KARNET_CONTROL_HOST_H_
