#ifndef KARNET_CONTROL_LOG_H_
#define KARNET_CONTROL_LOG_H_

#include <cstdio>

namespace karnet {

// The run's report stream: the log file beside the parameter file, stderr when
// that cannot be created, null before main sets it and after the run ended.
extern std::FILE* logStream;

void logSetStream(std::FILE* stream);
// Writes text unchanged; appends "\n" only when text holds no newline at all.
void logWrite(const char* text);
// printf-style write to the log stream (nothing when it is null), no newline rule.
void logPrintf(const char* format, ...) __attribute__((format(printf, 1, 2)));
void logClose();

}  // namespace karnet

#endif  // KARNET_CONTROL_LOG_H_
