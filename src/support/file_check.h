#ifndef KARNET_SUPPORT_FILE_CHECK_H_
#define KARNET_SUPPORT_FILE_CHECK_H_

#include <string>

namespace karnet {

// Why path cannot serve as an input file: empty when it is a readable regular
// file, else the reason in the user's words ("No such file or directory",
// "Permission denied", "not a regular file"). A FIFO or a device would block
// the run or never end, so only regular files are taken.
std::string inputFileProblem(const char* path);

}  // namespace karnet

#endif  // KARNET_SUPPORT_FILE_CHECK_H_
