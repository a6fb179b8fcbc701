#ifndef KARNET_CONTROL_COMMAND_LINE_H_
#define KARNET_CONTROL_COMMAND_LINE_H_

#include <cstddef>
#include <string>

namespace karnet {

// Size of the parameter-file and log-file name buffers, terminator included.
inline constexpr std::size_t kFileNameSize = 260;

// The arguments are those after the program's own name, in their order.

// True when some argument equals "//apv" (any case): the run goes under the
// progress host.
bool hasHostModeArgument(int count, const char* const* arguments);

// The number of threads of the computation: from "--threads N" or
// "--threads=N" among the arguments (the last one counts), else from the
// environment variable's text (KARNET_THREADS; null or empty: not set).
// Returns 1 with threads set, or with 0 when neither gives one (the caller's
// default); 0 when the number given is not a whole number from 1 to 4096.
int selectThreadCount(int count, const char* const* arguments, const char* environment,
                      int* threads);

// True when some argument equals "--quiet" (any case): no summary at the end.
bool hasQuietArgument(int count, const char* const* arguments);

// The program and its arguments as one line of shell words (arguments with
// blanks or quotes single-quoted), for the record of how a result was made.
std::string commandLineText(const char* program, int count, const char* const* arguments);

// Copies the last argument that is not "//apv", "--quiet", "-debug", a thread
// count ("--threads N", "--threads=N") or empty (any case)
// into name (kFileNameSize characters, always terminated; empty when there is
// none). Returns 1 when that name is also the last argument, as the usage
// requires, else 0. A name that does not fit the buffer is not the last
// argument and gives 0.
int selectParameterFile(int count, const char* const* arguments, char* name);

// The parameter file's path with its extension replaced by ".log" (added when
// it has none), so that the log lies beside the parameter file. Returns 0 and
// leaves output empty when the result does not fit kFileNameSize characters.
int makeLogFileName(const char* parameterFile, char* output);

}  // namespace karnet

#endif  // KARNET_CONTROL_COMMAND_LINE_H_
