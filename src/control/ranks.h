#ifndef KARNET_CONTROL_RANKS_H_
#define KARNET_CONTROL_RANKS_H_

#include <cstddef>
#include <cstdint>
#include <functional>

namespace karnet {

class RunError;

// The processes of one run. A run started by an MPI launcher (mpirun, srun)
// is shared out over its ranks; a run started plainly is one process, rank 0
// of 1, and never touches MPI. Rank 0 writes the log, the messages, the
// progress and the result file; the other ranks compute their share of the
// levels and hand them to rank 0.

// Joins the launcher's job when there is one (MPI_Init); harmless without.
void ranksInit(int* argc, char*** argv);
// Leaves the job (MPI_Finalize) once; harmless without one.
void ranksFinish();
// True when this process was started by an MPI launcher, before ranksInit
// (read from the launcher's environment).
bool ranksLaunched();

// The number of processes the launcher started (1 without a launcher), from
// its environment; also known to a build without MPI.
int ranksLaunchedCount();

int rankIndex();  // 0 .. rankCount() - 1
int rankCount();  // 1 for a plain run
inline bool rankLeads() { return rankIndex() == 0; }

// Adds count 64-bit integers element by element over every rank; every rank
// gets the sums. Without a job the values stay as they are.
void ranksSum(std::int64_t* values, int count);

// For every rank but 0: its standard output goes nowhere and its standard
// error stream is kept aside, to be shown only when the rank ends alone (see
// ranksEnd); rank 0 speaks for the run. False when the streams could not be
// set up.
bool ranksQuietFollower();

// Sends count floats to rank `to` / receives them from rank `from`; tag
// tells the messages of one pair apart. They return in the order called, once
// the message has gone or come; while they wait, the end of another rank is
// looked for (see ranksCheckEnd) and the waiting check runs.
void ranksSendFloats(const float* data, std::size_t count, int to, int tag);
void ranksReceiveFloats(float* data, std::size_t count, int from, int tag);

// The ranks agree on how the run ends: each gives its own exit code (or -1
// when it has none yet); every rank gets the code of the lowest rank that
// gave one, or -1 when none did. A collective: every rank calls it at the
// same point.
std::int32_t ranksAgreeOnEnd(std::int32_t ownCode);

// The last step of a rank that ends with the code: leaves the job
// (MPI_Finalize) when every rank agreed on the end through ranksAgreeOnEnd,
// or when all ranks end by themselves within a short wait (an error in the
// inputs, which every rank meets). Otherwise it leaves the job as it is, so
// that the process's exit makes the launcher end the others (a rank alone in
// MPI_Finalize would wait for them forever); a rank other than 0 that ends
// alone then shows what it kept of its standard error stream.
void ranksEnd(std::int32_t exitCode);

// How the ranks learn that one of them ends: the first rank to end for a
// reason of its own (an error, a signal sent to it, a cancel) tells every
// other rank how (the kind, message and exit code), without waiting; each
// other rank ends the same way when it next looks: at its progress checks
// and in every wait on another rank. A rank that ends because another told it
// tells nobody. Harmless in a plain run.
void ranksAnnounceEnd(const RunError& error);
// Throws the end another rank announced, once; returns when none did.
void ranksCheckEnd();

// Runs in every wait on another rank, so that the waiting rank still sees a
// cancel or a signal (it may throw a RunError, which ends the wait).
void ranksSetWaitingCheck(std::function<void()> check);

// Ends every rank of the job at once with the code, from any one rank: for a
// failure that the other ranks cannot know of.
[[noreturn]] void ranksAbort(std::int32_t exitCode);

// True when this build can run under an MPI launcher.
bool ranksAvailable();

}  // namespace karnet

#endif  // KARNET_CONTROL_RANKS_H_
