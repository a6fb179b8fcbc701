#include "obs/files.h"

#include <fcntl.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <csignal>
#include <cerrno>
#include <cstdio>
#include <cstring>

#include "gridfile/grid_file.h"
#include "obs/observation.h"

namespace karnet::obs {

namespace {

// The temporary file being written, removed when a signal stops the program meanwhile.
char pendingFile[4096];
volatile std::sig_atomic_t pending = 0;
constexpr int kStopSignals[] = {SIGINT, SIGTERM, SIGHUP};

extern "C" void removePendingAndStop(int signalNumber) {
  if (pending != 0) ::unlink(pendingFile);
  std::signal(signalNumber, SIG_DFL);
  std::raise(signalNumber);
}

// Removes the temporary file on a stop signal while it exists.
class PendingFile {
 public:
  explicit PendingFile(const std::string& path) {
    std::snprintf(pendingFile, sizeof pendingFile, "%s", path.c_str());
    pending = path.size() < sizeof pendingFile ? 1 : 0;
    for (int s : kStopSignals) std::signal(s, removePendingAndStop);
  }
  ~PendingFile() {
    for (int s : kStopSignals) std::signal(s, SIG_DFL);
    pending = 0;
  }
  PendingFile(const PendingFile&) = delete;
  PendingFile& operator=(const PendingFile&) = delete;
};

}  // namespace

std::string bathymetryProjection(const std::string& path) {
  grdInitSystem();
  GrdHeader* header = nullptr;
  GrdFile* file = nullptr;
  if (grdFileRead(path.c_str(), &header, &file) != 0) {
    grdHeaderDestroy(&header);
    throw ObsError(path + ": cannot read the bathymetry file");
  }
  std::string projection;
  double longitude = 0.0, latitude = 0.0, orientation = 0.0;
  const int status = grdGetGeoInfoUTMProj(header, &projection, &longitude, &latitude, &orientation);
  grdHeaderDestroy(&header);
  if (status != 0 || projection.empty()) {
    throw ObsError(path + ": no projection in the bathymetry file's crs variable");
  }
  return projection;
}

void writeFileAtomically(const std::string& path, const std::string& text) {
  std::string temporary = path + ".tmpXXXXXX";
  const int fd = mkstemp(temporary.data());
  if (fd < 0) throw ObsError(path + ": cannot create: " + std::strerror(errno));
  const PendingFile guard(temporary);
  // mkstemp makes the file private; a result file gets the usual permissions.
  const mode_t mask = umask(0);
  umask(mask);
  fchmod(fd, 0666 & ~mask);
  const char* data = text.data();
  std::size_t left = text.size();
  int error = 0;
  while (left > 0) {
    const ssize_t written = ::write(fd, data, left);
    if (written < 0) {
      if (errno == EINTR) continue;
      error = errno;
      break;
    }
    data += written;
    left -= static_cast<std::size_t>(written);
  }
  if (error == 0 && fsync(fd) != 0) error = errno;
  if (::close(fd) != 0 && error == 0) error = errno;
  if (error == 0 && std::rename(temporary.c_str(), path.c_str()) != 0) error = errno;
  if (error != 0) {
    std::remove(temporary.c_str());
    throw ObsError(path + ": cannot write: " + std::strerror(error));
  }
}

}  // namespace karnet::obs
