// The processes of one run over MPI (or one plain process without it).
#include "control/ranks.h"

#include <cstdlib>
#include <initializer_list>
#include <limits>

#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <functional>
#include <string>
#include <utility>
#include <vector>

#include "support/run_error.h"

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
// The ending ranks meet here, and the news of an end travels here, apart from
// the run's own messages, so that neither is ever taken for the other.
MPI_Comm endComm = MPI_COMM_NULL;
// The run's small exchanges (sums, the agreement on the end), apart from the
// levels, which travel on MPI_COMM_WORLD tagged by their slot.
MPI_Comm runComm = MPI_COMM_NULL;
constexpr int kEndTag = 1;
constexpr int kSumTag = 2;
constexpr int kAgreeTag = 3;
// The news of an end: how the rank that sent it ends.
constexpr std::size_t kEndTextSize = 2048;
struct EndNews {
  std::int32_t kind;
  std::int32_t exitCode;
  char message[kEndTextSize];
  char notice[kEndTextSize];
};
// This rank has told the others of its end, or learned of another's.
bool endAnnounced = false;
bool endHeard = false;
// Sent without waiting: the news and the data of a send given up at an end
// stay here until the process ends, where MPI may still read them.
EndNews outgoingNews;
std::vector<float> outgoingFloats;
std::function<void()> waitingCheck;
// A follower's own standard error stream, and the file its messages go to.
int followerStderr = -1;
std::FILE* keptMessages = nullptr;
// How long an ending rank waits for the others to end as well (they learn of
// the end at their next progress check).
constexpr double kEndWaitSeconds = 30.0;
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
  MPI_Comm_dup(MPI_COMM_WORLD, &runComm);
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

void ranksSetWaitingCheck(std::function<void()> check) {
#ifdef KARNET_WITH_MPI
  waitingCheck = std::move(check);
#else
  (void)check;
#endif
}

#ifdef KARNET_WITH_MPI
namespace {

// Messages longer than an int can count go in pieces.
constexpr std::size_t kPiece = std::size_t{1} << 30;

RunError errorFrom(const EndNews& news) {
  std::string message(news.message, strnlen(news.message, kEndTextSize));
  std::string notice(news.notice, strnlen(news.notice, kEndTextSize));
  RunError error = RunError::fatal(message, news.exitCode);
  switch (static_cast<RunError::Kind>(news.kind)) {
    case RunError::Kind::kLogged:
      error = RunError::logged(message, news.exitCode);
      break;
    case RunError::Kind::kMemory:
      error = RunError::memory(message);
      break;
    case RunError::Kind::kCancelled:
      error = RunError::cancelled();
      break;
    case RunError::Kind::kFatal:
      break;
  }
  return notice.empty() ? error : std::move(error).withNotice(notice);
}

// The news of another rank's end, when some has come.
bool newsArrived(EndNews& news) {
  int arrived = 0;
  MPI_Status status;
  MPI_Iprobe(MPI_ANY_SOURCE, kEndTag, endComm, &arrived, &status);
  if (arrived == 0) return false;
  MPI_Recv(&news, sizeof news, MPI_BYTE, status.MPI_SOURCE, kEndTag, endComm, MPI_STATUS_IGNORE);
  return true;
}

// Gives up a request this rank no longer waits for: a receive is cancelled,
// a send left to go (its data stays where it is until the process ends).
void giveUp(MPI_Request& request, bool receive) {
  if (request == MPI_REQUEST_NULL) return;
  if (receive) {
    MPI_Cancel(&request);
    MPI_Wait(&request, MPI_STATUS_IGNORE);
  } else {
    MPI_Request_free(&request);
  }
}

// Waits for the request, looking meanwhile for the end of another rank and
// running the waiting check; either may end the wait by throwing, after the
// request was given up.
void waitFor(MPI_Request& request, bool receive) {
  long pauseNs = 20000;
  for (;;) {
    int done = 0;
    MPI_Test(&request, &done, MPI_STATUS_IGNORE);
    if (done != 0) return;
    try {
      ranksCheckEnd();
      if (waitingCheck) waitingCheck();
    } catch (...) {
      giveUp(request, receive);
      throw;
    }
    struct timespec pause = {0, pauseNs};
    nanosleep(&pause, nullptr);
    pauseNs = std::min(pauseNs * 2, 1000000L);
  }
}

void send(const void* data, int count, MPI_Datatype type, int to, int tag, MPI_Comm comm) {
  MPI_Request request = MPI_REQUEST_NULL;
  MPI_Isend(data, count, type, to, tag, comm, &request);
  waitFor(request, false);
}

void receive(void* data, int count, MPI_Datatype type, int from, int tag, MPI_Comm comm) {
  MPI_Request request = MPI_REQUEST_NULL;
  MPI_Irecv(data, count, type, from, tag, comm, &request);
  waitFor(request, true);
}

// Calls move(first, n) for the pieces of count floats that one message can take.
template <typename Move>
void inPieces(std::size_t count, const Move& move) {
  std::size_t done = 0;
  do {
    const std::size_t n = count - done < kPiece ? count - done : kPiece;
    move(done, static_cast<int>(n));
    done += n;
  } while (done < count);
}

}  // namespace
#endif

void ranksAnnounceEnd(const RunError& error) {
#ifdef KARNET_WITH_MPI
  if (!joined || finished || rankTotal == 1 || endAnnounced || endHeard) return;
  endAnnounced = true;
  std::memset(&outgoingNews, 0, sizeof outgoingNews);
  outgoingNews.kind = static_cast<std::int32_t>(error.kind());
  outgoingNews.exitCode = error.exitCode();
  std::strncpy(outgoingNews.message, error.message().c_str(), kEndTextSize - 1);
  std::strncpy(outgoingNews.notice, error.notice().c_str(), kEndTextSize - 1);
  for (int r = 0; r < rankTotal; ++r) {
    if (r == ownRank) continue;
    MPI_Request request = MPI_REQUEST_NULL;
    MPI_Isend(&outgoingNews, sizeof outgoingNews, MPI_BYTE, r, kEndTag, endComm, &request);
    MPI_Request_free(&request);
  }
#else
  (void)error;
#endif
}

void ranksCheckEnd() {
#ifdef KARNET_WITH_MPI
  if (!joined || finished || rankTotal == 1 || endAnnounced || endHeard) return;
  EndNews news;
  if (!newsArrived(news)) return;
  endHeard = true;
  throw errorFrom(news);
#endif
}

void ranksSum(std::int64_t* values, int count) {
#ifdef KARNET_WITH_MPI
  if (!joined || finished || rankTotal == 1 || count <= 0) return;
  // Gathered to rank 0, summed in rank order and sent back: point to point,
  // so that a rank that ends meanwhile leaves no one waiting.
  if (ownRank != 0) {
    send(values, count, MPI_INT64_T, 0, kSumTag, runComm);
    receive(values, count, MPI_INT64_T, 0, kSumTag, runComm);
    return;
  }
  std::vector<std::int64_t> part(static_cast<std::size_t>(count));
  for (int r = 1; r < rankTotal; ++r) {
    receive(part.data(), count, MPI_INT64_T, r, kSumTag, runComm);
    for (int i = 0; i < count; ++i) values[i] += part[static_cast<std::size_t>(i)];
  }
  for (int r = 1; r < rankTotal; ++r) send(values, count, MPI_INT64_T, r, kSumTag, runComm);
#else
  (void)values;
  (void)count;
#endif
}

void ranksSendFloats(const float* data, std::size_t count, int to, int tag) {
#ifdef KARNET_WITH_MPI
  // Sent from a copy that outlives a send given up at an end.
  outgoingFloats.assign(data, data + count);
  inPieces(count, [to, tag](std::size_t first, int n) {
    send(outgoingFloats.data() + first, n, MPI_FLOAT, to, tag, MPI_COMM_WORLD);
  });
#else
  (void)data;
  (void)count;
  (void)to;
  (void)tag;
#endif
}

void ranksReceiveFloats(float* data, std::size_t count, int from, int tag) {
#ifdef KARNET_WITH_MPI
  inPieces(count, [data, from, tag](std::size_t first, int n) {
    receive(data + first, n, MPI_FLOAT, from, tag, MPI_COMM_WORLD);
  });
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
    // Rank 0 collects every rank's code and hands back that of the lowest
    // rank with one (-1 when none has one).
    std::int32_t code = ownCode;
    if (ownRank != 0) {
      send(&code, 1, MPI_INT32_T, 0, kAgreeTag, runComm);
      receive(&code, 1, MPI_INT32_T, 0, kAgreeTag, runComm);
    } else {
      for (int r = 1; r < rankTotal; ++r) {
        std::int32_t theirs = -1;
        receive(&theirs, 1, MPI_INT32_T, r, kAgreeTag, runComm);
        if (code < 0) code = theirs;
      }
      for (int r = 1; r < rankTotal; ++r) send(&code, 1, MPI_INT32_T, r, kAgreeTag, runComm);
    }
    endAgreed = true;
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
