// karnet: grids scattered 3-D ocean observations over a bathymetry.
//
// The entry records the run mode in H84, then either runs the computation under
// the progress host (argument "//apv") or directly. The run never comes back
// here: it ends the process through the exit path of the run control.
#include <fcntl.h>
#include <strings.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>

#include "control/command_line.h"
#include "control/cross_validate_run.h"
#include "control/host.h"
#include "control/log.h"
#include "control/ranks.h"
#include "control/run_driver.h"
#include "control/termination.h"
#include "control/threads.h"
#include "params/run_setup.h"

namespace {

constexpr char kUsage[] = "Usage: karnet.exe [//apv] [options] pfs-file";
constexpr char kThreadsError[] = "--threads and KARNET_THREADS take a number from 1 to 4096";
constexpr char kOwnLogError[] =
    "ERROR: the parameter file's name ends in .log, the name its log file would take: rename it";

constexpr char kHelp[] =
    "\n"
    "Grids scattered 3-D observations (x y z value per line, projected map\n"
    "coordinates) onto a regular 3-D grid over a bathymetry and writes it as a\n"
    "NetCDF result file. The log is written beside the parameter file, with the\n"
    "extension .log. Exit code 0: complete or cancelled; 1: error.\n"
    "\n"
    "Options:\n"
    "  //apv      run under the progress display; q or SIGUSR1 cancels the run\n"
    "  --quiet    no summary (result, grid, observations) on stderr at the end\n"
    "  -debug     accepted, without effect\n"
    "  --cross-validate\n"
    "             leave one cast out at a time and compare the objective analysis\n"
    "             with it: RMS and bias per level on stdout and in CASE_cv.csv;\n"
    "             no result file is written\n"
    "  --sweep KEYWORD=V1,V2,... [KEYWORD=...]\n"
    "             cross-validate every combination of these objective-analysis\n"
    "             values (DecayDistance, ZeroCrossingDistance, ErrorVariance,\n"
    "             CorrelationSampleSize, SearchRadius, MinData, MaxData); the table,\n"
    "             best combination marked, goes to stdout and CASE_sweep.csv\n"
    "  --threads N\n"
    "             threads of the computation (default: KARNET_THREADS, else all\n"
    "             cores); the result is the same for any number\n"
    "  --help     this text\n"
    "  --version  the program's version\n"
    "\n"
    "The parameter file holds the target [Q4_DIGITIZING_OF_DATA] with five sections:\n"
    "  [INPUT_FILES]          DataFileName = |observations|, FileName = |bathymetry.nc|,\n"
    "                         Projection = 'UTM-32' (or LOCAL, EPSG:code, PROJ text)\n"
    "  [DESCRIPTION_OF_GRID]  ZRange = first, last level; Spacing = level spacing [m]\n"
    "  [CALCULATION_PARAMETERS]\n"
    "                         SearchRadius, MaxExtrapolationDistance = up, down,\n"
    "                         Analysis = 'bilinear' (any other text: objective analysis)\n"
    "  [OBJECTIVE_ANALYSIS_PARAMETERS]\n"
    "                         ZeroCrossingDistance, DecayDistance, ErrorVariance,\n"
    "                         MinData, MaxData, FilterOperations, CorrelationSampleSize,\n"
    "                         FilterType = '12 pts filter' (any other text: Shapiro)\n"
    "  [OUTPUT_DATA]          FileName = |result.nc|, Title = 'text', ItemType = number\n"
    "Each section closes with EndSect; // starts a comment. All keywords are required.\n";

// Kept for the host's callback, which takes no arguments.
int argumentCount = 0;
char** argumentVector = nullptr;
const char* programPath = "karnet";
karnet::CrossValidationRequest crossValidation;

// Picks the parameter file, opens the log beside it, sets the run up and runs it.
[[noreturn]] void runMain(int count, char** arguments) {
  char parameterFile[karnet::kFileNameSize];
  if (karnet::selectParameterFile(count, arguments, parameterFile) == 0) {
    karnet::endRun(karnet::RunError::fatal(kUsage));
  }
  int threads = 0;
  if (karnet::selectThreadCount(count, arguments, std::getenv("KARNET_THREADS"), &threads) == 0) {
    karnet::endRun(karnet::RunError::fatal(kThreadsError));
  }
  if (threads == 0) threads = karnet::defaultThreadCount();

  char logFileName[karnet::kFileNameSize];
  std::FILE* log = nullptr;
  bool held = false;
  if (!karnet::rankLeads()) {
    // In a run over several processes the first one keeps the log.
    log = std::fopen("/dev/null", "w");
  } else if (karnet::makeLogFileName(parameterFile, logFileName) != 0) {
    // The log takes the parameter file's name with .log: a parameter file
    // already named so would be its own log.
    if (karnet::sameExistingFile(logFileName, parameterFile)) {
      karnet::logSetStream(stderr);
      karnet::endRun(karnet::RunError::fatal(kOwnLogError));
    }
    // Opened without emptying it: it is emptied once the run's inputs are
    // known not to include it (held until then).
    const int fd = ::open(logFileName, O_WRONLY | O_CREAT | O_CLOEXEC, 0666);
    log = fd >= 0 ? ::fdopen(fd, "w") : nullptr;
    if (log == nullptr && fd >= 0) ::close(fd);
    held = log != nullptr;
  }
  // Line-buffered, so that a user (or a script) following the log sees each
  // report line as soon as it is written; the log is small.
  if (log != nullptr) std::setvbuf(log, nullptr, _IOLBF, 0);
  if (held) {
    karnet::logHold(log);
  } else {
    karnet::logSetStream(log != nullptr ? log : stderr);
  }

  karnet::RunInvocation invocation;
  invocation.commandLine = karnet::commandLineText(programPath, count, arguments);
  invocation.quiet = karnet::hasQuietArgument(count, arguments);
  invocation.threads = threads;
  invocation.crossValidation = crossValidation;
  karnet::runProgram(parameterFile, invocation);
}

int hostEntry() { runMain(argumentCount, argumentVector); }

// --help and --version answer on stdout and leave without a log.
bool answerInformationRequest(int count, char** arguments) {
  for (int i = 0; i < count; ++i) {
    if (strcasecmp(arguments[i], "--help") == 0) {
      std::printf("%s\n%s", kUsage, kHelp);
      return true;
    }
    if (strcasecmp(arguments[i], "--version") == 0) {
      std::printf("karnet %s\n", KARNET_VERSION);
      return true;
    }
  }
  return false;
}

}  // namespace

int main(int argc, char** argv) {
  // Under an MPI launcher every process is one rank of the run; the first
  // speaks for all of them: the others' messages and progress go nowhere.
  karnet::ranksInit(&argc, &argv);
  if (!karnet::ranksAvailable() && karnet::ranksLaunchedCount() > 1) {
    // Each process would make the whole run and write the same files.
    std::fputs("karnet: this karnet was built without MPI (CMake option KARNET_MPI): run it "
               "without mpirun, or build it with MPI\n", stderr);
    return 1;
  }
  // The platform hands the arguments already split; the program's own name is
  // not one of them.
  argumentCount = argc > 0 ? argc - 1 : 0;
  if (argc > 0 && argv[0] != nullptr) programPath = argv[0];
  argumentVector = argc > 0 ? argv + 1 : argv;

  if (!karnet::ranksQuietFollower()) karnet::ranksAbort(1);
  // Every rank runs in the mode asked for, so that a cancel (SIGUSR1, which
  // mpirun passes on to all of them) reaches each.
  const bool hostMode = karnet::hasHostModeArgument(argumentCount, argumentVector);
  setenv("H84", hostMode ? "APV" : "WIN", 1);

  if (answerInformationRequest(argumentCount, argumentVector)) {
    karnet::ranksFinish();
    return 0;
  }

  std::string problem;
  if (!karnet::takeCrossValidationArguments(argumentCount, argumentVector, crossValidation,
                                            problem)) {
    std::fprintf(stderr, "karnet: %s\n%s\n", problem.c_str(), kUsage);
    return 1;
  }

  if (hostMode) {
    char programName[karnet::kFileNameSize] = "";
    karnet::moduleBaseName(programName, sizeof programName);
    karnet::apvStart(programName, hostEntry);
    return 0;
  }
  runMain(argumentCount, argumentVector);
}
