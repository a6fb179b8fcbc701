// The processes of one run over MPI (or one plain process without it).
#include "control/ranks.h"

#include <cstdlib>
#include <initializer_list>
#include <limits>

#include <time.h>
#include <unistd.h>

#include <cstdio>
#include <string>

#ifdef KARNET_WITH_MPI
// The C interface only, also when compiled as C++.
#define OMPI_SKIP_MPICXX 1
#define MPICH_SKIP_MPICXX 1
#include <mpi.h>
#endif

namespace karnet {
namespace {

int ownRank = 0;
int rankTotal = 1;
#ifdef KARNET_WITH_MPI
bool joined = false;
bool finished = false;
bool endAgreed = false;
// The ending ranks meet here, apart from the run's own collectives, so that a
// rank that ends early never meets one of those by mistake.
MPI_Comm endComm = MPI_COMM_NULL;
constexpr int kCancelTag = 1;
bool cancelAnnounced = false;
// A follower's own standard error stream, and the file its messages go to.
int followerStderr = -1;
std::FILE* keptMessages = nullptr;
// How long an ending rank waits for the others to end as well.
constexpr double kEndWaitSeconds = 5.0;
#endif

}  // namespace

bool ranksAvailable() {
#ifdef KARNET_WITH_MPI
  return true;
#else
  return false;
#endif
}

bool ranksLaunched() {
  // Open MPI's mpirun, PMIx launchers (srun --mpi=pmix, prterun) and the
  // PMI-1/2 launchers each leave their mark in the environment.
  for (const char* name : {"OMPI_COMM_WORLD_SIZE", "PMIX_RANK", "PMI_RANK", "PMI_SIZE"}) {
    if (std::getenv(name) != nullptr) return true;
  }
  return false;
}

int ranksLaunchedCount() {
  for (const char* name : {"OMPI_COMM_WORLD_SIZE", "PMI_SIZE"}) {
    const char* text = std::getenv(name);
    if (text != nullptr) return std::atoi(text) > 1 ? std::atoi(text) : 1;
  }
  return 1;
}

void ranksInit(int* argc, char*** argv) {
#ifdef KARNET_WITH_MPI
  // A plain run stays a plain process: MPI is started only under a launcher.
  if (joined || !ranksLaunched()) return;
  int provided = 0;
  // Threads compute inside a rank; only the thread that drives the run calls MPI.
  if (MPI_Init_thread(argc, argv, MPI_THREAD_FUNNELED, &provided) != MPI_SUCCESS) return;
  joined = true;
  MPI_Comm_rank(MPI_COMM_WORLD, &ownRank);
  MPI_Comm_size(MPI_COMM_WORLD, &rankTotal);
  MPI_Comm_dup(MPI_COMM_WORLD, &endComm);
#else
  (void)argc;
  (void)argv;
#endif
}

void ranksFinish() {
#ifdef KARNET_WITH_MPI
  if (!joined || finished) return;
  finished = true;
  MPI_Finalize();
#endif
}

int rankIndex() { return ownRank; }
int rankCount() { return rankTotal; }

void ranksSum(std::int64_t* values, int count) {
#ifdef KARNET_WITH_MPI
  if (!joined || finished || rankTotal == 1 || count <= 0) return;
  MPI_Allreduce(MPI_IN_PLACE, values, count, MPI_INT64_T, MPI_SUM, MPI_COMM_WORLD);
#else
  (void)values;
  (void)count;
#endif
}

#ifdef KARNET_WITH_MPI
namespace {
// Messages longer than an int can count go in pieces.
constexpr std::size_t kPiece = std::size_t{1} << 30;
}  // namespace
#endif

void ranksSendFloats(const float* data, std::size_t count, int to, int tag) {
#ifdef KARNET_WITH_MPI
  std::size_t done = 0;
  do {
    const std::size_t n = count - done < kPiece ? count - done : kPiece;
    MPI_Send(data + done, static_cast<int>(n), MPI_FLOAT, to, tag, MPI_COMM_WORLD);
    done += n;
  } while (done < count);
#else
  (void)data;
  (void)count;
  (void)to;
  (void)tag;
#endif
}

void ranksReceiveFloats(float* data, std::size_t count, int from, int tag) {
#ifdef KARNET_WITH_MPI
  std::size_t done = 0;
  do {
    const std::size_t n = count - done < kPiece ? count - done : kPiece;
    MPI_Recv(data + done, static_cast<int>(n), MPI_FLOAT, from, tag, MPI_COMM_WORLD,
             MPI_STATUS_IGNORE);
    done += n;
  } while (done < count);
#else
  (void)data;
  (void)count;
  (void)from;
  (void)tag;
#endif
}

std::int32_t ranksAgreeOnEnd(std::int32_t ownCode) {
#ifdef KARNET_WITH_MPI
  if (joined && !finished && rankTotal > 1) {
    // The lowest rank with a code speaks for all: its rank first, then its code.
    int speaker = ownCode >= 0 ? ownRank : std::numeric_limits<int>::max();
    MPI_Allreduce(MPI_IN_PLACE, &speaker, 1, MPI_INT, MPI_MIN, MPI_COMM_WORLD);
    endAgreed = true;
    if (speaker == std::numeric_limits<int>::max()) return -1;
    std::int32_t code = ownCode;
    MPI_Bcast(&code, 1, MPI_INT32_T, speaker, MPI_COMM_WORLD);
    return code;
  }
#endif
  return ownCode;
}

bool ranksQuietFollower() {
#ifdef KARNET_WITH_MPI
  if (ownRank == 0) return true;
  if (std::freopen("/dev/null", "w", stdout) == nullptr) return false;
  std::fflush(stderr);
  followerStderr = dup(STDERR_FILENO);
  keptMessages = std::tmpfile();
  if (followerStderr < 0 || keptMessages == nullptr) return false;
  return dup2(fileno(keptMessages), STDERR_FILENO) >= 0;
#else
  return true;
#endif
}

#ifdef KARNET_WITH_MPI
namespace {

// What a follower that ends alone wrote to its standard error stream, shown
// on its own stream with its rank.
void showKeptMessages(std::int32_t exitCode) {
  if (followerStderr < 0 || keptMessages == nullptr) return;
  std::fflush(stderr);
  std::string text = "karnet: rank " + std::to_string(ownRank) + " of " +
                     std::to_string(rankTotal) + " stopped alone with exit code " +
                     std::to_string(exitCode) + "\n";
  char buffer[4096];
  off_t at = 0;
  ssize_t n = 0;
  while (text.size() < 65536 && (n = pread(fileno(keptMessages), buffer, sizeof buffer, at)) > 0) {
    text.append(buffer, static_cast<std::size_t>(n));
    at += n;
  }
  if (!text.empty() && text.back() != '\n') text += '\n';
  for (std::size_t done = 0; done < text.size();) {
    const ssize_t w = write(followerStderr, text.data() + done, text.size() - done);
    if (w <= 0) break;
    done += static_cast<std::size_t>(w);
  }
}

}  // namespace
#endif

void ranksAnnounceCancel() {
#ifdef KARNET_WITH_MPI
  if (!joined || finished || ownRank != 0 || cancelAnnounced) return;
  cancelAnnounced = true;
  static int word = 1;
  for (int r = 1; r < rankTotal; ++r) {
    MPI_Request request = MPI_REQUEST_NULL;
    MPI_Isend(&word, 1, MPI_INT, r, kCancelTag, endComm, &request);
    MPI_Request_free(&request);
  }
#endif
}

bool ranksCancelAnnounced() {
#ifdef KARNET_WITH_MPI
  if (!joined || finished || ownRank == 0) return false;
  if (cancelAnnounced) return true;
  int arrived = 0;
  MPI_Iprobe(0, kCancelTag, endComm, &arrived, MPI_STATUS_IGNORE);
  if (arrived != 0) {
    int word = 0;
    MPI_Recv(&word, 1, MPI_INT, 0, kCancelTag, endComm, MPI_STATUS_IGNORE);
    cancelAnnounced = true;
  }
  return cancelAnnounced;
#else
  return false;
#endif
}

void ranksEnd(std::int32_t exitCode) {
#ifdef KARNET_WITH_MPI
  if (!joined || finished) return;
  if (!endAgreed && rankTotal > 1) {
    // Errors in the inputs reach every rank alike, and each ends by itself:
    // when all of them end within the wait they leave the job together.
    // Otherwise this rank leaves without the others, and the launcher ends
    // the job.
    int key = ownRank * 256 + (exitCode & 255);
    int lowest = 0;
    MPI_Request request = MPI_REQUEST_NULL;
    MPI_Iallreduce(&key, &lowest, 1, MPI_INT, MPI_MIN, endComm, &request);
    const double until = MPI_Wtime() + kEndWaitSeconds;
    int done = 0;
    while (MPI_Test(&request, &done, MPI_STATUS_IGNORE) == MPI_SUCCESS && done == 0 &&
           MPI_Wtime() < until) {
      struct timespec pause = {0, 1000000};
      nanosleep(&pause, nullptr);
    }
    if (done == 0) {
      showKeptMessages(exitCode);
      return;
    }
  } else if (rankTotal > 1) {
    // No rank leaves before all have closed their log: the launcher ends the
    // job as soon as one rank exits with an error.
    MPI_Barrier(endComm);
  }
  ranksFinish();
#else
  (void)exitCode;
#endif
}

void ranksAbort(std::int32_t exitCode) {
#ifdef KARNET_WITH_MPI
  if (joined && !finished) MPI_Abort(MPI_COMM_WORLD, exitCode);
#endif
  std::_Exit(exitCode);
}

}  // namespace karnet
