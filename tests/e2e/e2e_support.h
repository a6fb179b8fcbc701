#ifndef KARNET_TESTS_E2E_E2E_SUPPORT_H_
#define KARNET_TESTS_E2E_E2E_SUPPORT_H_

#include <functional>
#include <map>
#include <string>
#include <vector>

#include "common/temp_dir.h"

namespace karnet::e2e {

using TempDir = karnet::test::TempDir;

struct ProcessResult {
  int exitCode = -1;    // exit status when the process exited
  int termSignal = 0;   // signal number when a signal killed it
  std::string out;      // standard output
  std::string err;      // standard error
};

// Runs program with args in directory cwd (standard input from /dev/null), with extra
// environment variables set. While it runs, whileRunning (if given) is called every 20 ms with
// the process id until it returns true. Gives up and kills the process after timeoutSeconds.
ProcessResult runProgram(const std::string& program, const std::vector<std::string>& args,
                         const std::string& cwd,
                         const std::map<std::string, std::string>& env = {},
                         const std::function<bool(int)>& whileRunning = {},
                         int timeoutSeconds = 120);

ProcessResult runKarnet(const std::vector<std::string>& args, const std::string& cwd,
                        const std::map<std::string, std::string>& env = {},
                        const std::function<bool(int)>& whileRunning = {});

// Batch mode: karnet writes its messages to the log only.
inline const std::map<std::string, std::string> kBatch = {{"buildmode", "nigth"}};

// A karnet run in dir on the parameter file that ends args, with the log it left there.
struct CaseRun : ProcessResult {
  std::string log;
};
CaseRun runCase(const TempDir& dir, const std::vector<std::string>& args = {"case.pfs"},
                const std::map<std::string, std::string>& env = kBatch,
                const std::function<bool(int)>& whileRunning = {});

bool contains(const std::string& text, const std::string& part);
// The lines of text that start with prefix, or (keep false) all the others.
std::string linesStartingWith(const std::string& text, const std::string& prefix, bool keep = true);
// A log without its CPU time, the only line that differs between runs of one case.
inline std::string withoutCpuTime(const std::string& log) {
  return linesStartingWith(log, "-- CPU time", false);
}

void writeFile(const std::string& path, const std::string& text);
std::string readFile(const std::string& path);  // empty when missing
bool fileExists(const std::string& path);
std::vector<std::string> listDir(const std::string& path);
std::vector<std::string> splitLines(const std::string& text);

// The keywords of a parameter file, with values as they are written in the file.
// Sections whose name is in `omit` are left out; `extra` lines go into INPUT_FILES.
struct ParameterFile {
  std::string dataFileName = "|observations.txt|";
  std::string fileName = "|bathymetry.nc|";
  std::string projection = "'LOCAL'";
  std::string zRange = "0, 11";
  std::string spacing = "2.5";
  std::string searchRadius = "2500";
  std::string maxExtrapolationDistance = "5, 10";
  std::string analysis = "bilinear";
  std::string zeroCrossingDistance = "2500";
  std::string decayDistance = "1200";
  std::string errorVariance = "10";
  std::string minData = "-5";
  std::string maxData = "40";
  std::string filterOperations = "1";
  std::string correlationSampleSize = "8";
  std::string filterType = "'12 pts filter'";
  std::string outputFileName = "|result.nc|";
  std::string title = "'karnet test case'";
  std::string itemType = "2";
  std::vector<std::string> omit;

  std::string render() const;
};

// A bathymetry file in the layout karnet reads, written directly with the NetCDF library.
// heights holds nx * ny values, x fastest, row 0 at the origin (south-west).
struct BathymetrySpec {
  int nx = 0;
  int ny = 0;
  double spacing = 250.0;
  std::vector<float> heights;
  std::string projection = "UTM-32";
  double originLongitude = 11.3;
  double originLatitude = 55.2;
  double orientation = 0.0;
  float landValue = 10.0f;
};
void writeBathymetry(const std::string& path, const BathymetrySpec& grid);
// nx x ny nodes of the given spacing, all at one height, in the LOCAL projection (plain metres)
// with the origin at (x0, y0).
BathymetrySpec localBasin(int nx, int ny, double spacing, float height, double x0 = 1000.0,
                          double y0 = 2000.0);

// A small complete case in dir: a 30 x 24 node basin of 250 m cells with a dry corner
// (land value 10), in the LOCAL projection with its origin at (1000, 2000) and orientation 0,
// and casts of a temperature that falls with depth and rises towards the east.
// Returns the observation text it wrote.
std::string writeSmallCase(const TempDir& dir, const ParameterFile& parameters);

// The values of a NetCDF variable as doubles; empty when the file or the variable is missing.
std::vector<double> readVariable(const std::string& path, const char* name);

// Reads a result file's only item (time, z, y, x) as floats; shape gets (nz, ny, nx).
std::vector<float> readResult(const std::string& path, std::string* itemName, int shape[3]);

}  // namespace karnet::e2e

#endif  // KARNET_TESTS_E2E_E2E_SUPPORT_H_
