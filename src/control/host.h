#ifndef KARNET_CONTROL_HOST_H_
#define KARNET_CONTROL_HOST_H_

namespace karnet {

// The progress host on a terminal. In plain mode (H84=WIN) the calls draw a
// progress line on stderr when it is a terminal and apvCancel gives 0; in host
// mode (//apv) apvStart runs the callback under a display and the user cancels
// with the key q or SIGUSR1.
int apvStart(const char* programName, int (*callback)());
int apvStatus(const char* text);
int apvProgress(int percent);
int apvTimeLeft(int seconds);
int apvSpeed(int unitsPerSecond);
int apvCancel();
int apvMessage(const char* text, const char* caption, int style);

// Restores the terminal and clears the progress line; safe to call any time.
void apvShutdown();

}  // namespace karnet

#endif  // KARNET_CONTROL_HOST_H_
