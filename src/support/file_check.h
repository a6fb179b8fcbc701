#ifndef KARNET_SUPPORT_FILE_CHECK_H_
#define KARNET_SUPPORT_FILE_CHECK_H_

#include <string>

namespace karnet {

// Why path cannot serve as an input file: empty when it is a readable regular
// file, else the reason in the user's words ("No such file or directory",
// "Permission denied", "not a regular file"). A FIFO or a device would block
// the run or never end, so only regular files are taken.
std::string inputFileProblem(const char* path);

// The line that names a file and what is wrong with it on the standard error
// stream: "karnet: FILE: REASON" and a line end.
std::string fileNotice(const std::string& file, const std::string& reason);

// "karnet: TEXT" and a line end, for a text that names its file itself
// ("case.pfs:3: ...").
std::string notice(const std::string& text);

}  // namespace karnet

#endif  // KARNET_SUPPORT_FILE_CHECK_H_
