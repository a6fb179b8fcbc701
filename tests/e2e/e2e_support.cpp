#include "e2e/e2e_support.h"

#include <dirent.h>
#include <fcntl.h>
#include <netcdf.h>
#include <signal.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <stdexcept>
#include <thread>

namespace karnet::e2e {

void writeFile(const std::string& path, const std::string& text) {
  std::ofstream out(path, std::ios::binary);
  out << text;
  if (!out) throw std::runtime_error("cannot write " + path);
}

std::string readFile(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  std::ostringstream text;
  text << in.rdbuf();
  return text.str();
}

bool fileExists(const std::string& path) {
  struct stat info;
  return ::stat(path.c_str(), &info) == 0;
}

std::vector<std::string> listDir(const std::string& path) {
  std::vector<std::string> names;
  for (const auto& entry : std::filesystem::directory_iterator(path)) {
    names.push_back(entry.path().filename().string());
  }
  return names;
}

std::vector<std::string> splitLines(const std::string& text) {
  std::vector<std::string> lines;
  std::string line;
  std::istringstream in(text);
  while (std::getline(in, line)) lines.push_back(line);
  return lines;
}

ProcessResult runProgram(const std::string& program, const std::vector<std::string>& args,
                         const std::string& cwd, const std::map<std::string, std::string>& env,
                         const std::function<bool(int)>& whileRunning, int timeoutSeconds) {
  TempDir capture;
  const std::string outName = capture.file("out");
  const std::string errName = capture.file("err");
  const pid_t pid = fork();
  if (pid < 0) throw std::runtime_error("fork failed");
  if (pid == 0) {
    if (chdir(cwd.c_str()) != 0) _exit(127);
    const int in = open("/dev/null", O_RDONLY);
    const int out = open(outName.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
    const int err = open(errName.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
    if (in < 0 || out < 0 || err < 0) _exit(127);
    dup2(in, 0);
    dup2(out, 1);
    dup2(err, 2);
    for (const auto& [name, value] : env) setenv(name.c_str(), value.c_str(), 1);
    std::vector<char*> argv;
    argv.push_back(const_cast<char*>(program.c_str()));
    for (const auto& a : args) argv.push_back(const_cast<char*>(a.c_str()));
    argv.push_back(nullptr);
    execv(program.c_str(), argv.data());
    _exit(127);
  }
  ProcessResult result;
  bool watching = static_cast<bool>(whileRunning);
  const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(timeoutSeconds);
  int status = 0;
  for (;;) {
    const pid_t done = waitpid(pid, &status, WNOHANG);
    if (done == pid) break;
    if (std::chrono::steady_clock::now() > deadline) {
      kill(pid, SIGKILL);
      waitpid(pid, &status, 0);
      break;
    }
    if (watching && whileRunning(pid)) watching = false;
    std::this_thread::sleep_for(std::chrono::milliseconds(20));
  }
  if (WIFEXITED(status)) result.exitCode = WEXITSTATUS(status);
  if (WIFSIGNALED(status)) result.termSignal = WTERMSIG(status);
  result.out = readFile(outName);
  result.err = readFile(errName);
  return result;
}

ProcessResult runKarnet(const std::vector<std::string>& args, const std::string& cwd,
                        const std::map<std::string, std::string>& env,
                        const std::function<bool(int)>& whileRunning) {
  return runProgram(KARNET_BINARY, args, cwd, env, whileRunning);
}

CaseRun runCase(const TempDir& dir, const std::vector<std::string>& args,
                const std::map<std::string, std::string>& env,
                const std::function<bool(int)>& whileRunning) {
  CaseRun run;
  static_cast<ProcessResult&>(run) = runKarnet(args, dir.path(), env, whileRunning);
  const std::string pfs = args.empty() ? "" : args.back();
  run.log = readFile(dir.file(pfs.substr(0, pfs.rfind('.')) + ".log"));
  return run;
}

bool contains(const std::string& text, const std::string& part) {
  return text.find(part) != std::string::npos;
}

std::string linesStartingWith(const std::string& text, const std::string& prefix, bool keep) {
  std::string kept;
  for (const std::string& line : splitLines(text)) {
    if ((line.rfind(prefix, 0) == 0) == keep) kept += line + "\n";
  }
  return kept;
}

std::string ParameterFile::render() const {
  auto kept = [this](const std::string& section) {
    for (const auto& name : omit) {
      if (name == section) return false;
    }
    return true;
  };
  std::ostringstream p;
  p << "// karnet test case\n[Q4_DIGITIZING_OF_DATA]\n";
  if (kept("INPUT_FILES")) {
    p << "   [INPUT_FILES]\n"
      << "      DataFileName = " << dataFileName << "\n"
      << "      FileName = " << fileName << "   // the bathymetry\n"
      << "      Projection = " << projection << "\n"
      << "   EndSect  // INPUT_FILES\n\n";
  }
  if (kept("DESCRIPTION_OF_GRID")) {
    p << "   [DESCRIPTION_OF_GRID]\n"
      << "      ZRange = " << zRange << "\n"
      << "      Spacing = " << spacing << "\n"
      << "   EndSect  // DESCRIPTION_OF_GRID\n\n";
  }
  if (kept("CALCULATION_PARAMETERS")) {
    p << "   [CALCULATION_PARAMETERS]\n"
      << "      SearchRadius = " << searchRadius << "\n"
      << "      MaxExtrapolationDistance = " << maxExtrapolationDistance << "\n"
      << "      Analysis = " << analysis << "\n"
      << "   EndSect  // CALCULATION_PARAMETERS\n\n";
  }
  if (kept("OBJECTIVE_ANALYSIS_PARAMETERS")) {
    p << "   [OBJECTIVE_ANALYSIS_PARAMETERS]\n"
      << "      ZeroCrossingDistance = " << zeroCrossingDistance << "\n"
      << "      DecayDistance = " << decayDistance << "\n"
      << "      ErrorVariance = " << errorVariance << "\n"
      << "      MinData = " << minData << "\n"
      << "      MaxData = " << maxData << "\n"
      << "      FilterOperations = " << filterOperations << "\n"
      << "      CorrelationSampleSize = " << correlationSampleSize << "\n"
      << "      FilterType = " << filterType << "\n"
      << "   EndSect  // OBJECTIVE_ANALYSIS_PARAMETERS\n\n";
  }
  if (kept("OUTPUT_DATA")) {
    p << "   [OUTPUT_DATA]\n"
      << "      FileName = " << outputFileName << "\n"
      << "      Title = " << title << "\n"
      << "      ItemType = " << itemType << "\n"
      << "   EndSect  // OUTPUT_DATA\n\n";
  }
  p << "EndSect  // Q4_DIGITIZING_OF_DATA\n";
  return p.str();
}

namespace {
void check(int status, const char* what) {
  if (status != NC_NOERR) throw std::runtime_error(std::string(what) + ": " + nc_strerror(status));
}
}  // namespace

void writeBathymetry(const std::string& path, const BathymetrySpec& grid) {
  int nc = 0;
  check(nc_create(path.c_str(), NC_CLOBBER | NC_NETCDF4, &nc), "create");
  int yDim = 0, xDim = 0;
  check(nc_def_dim(nc, "y", grid.ny, &yDim), "y dim");
  check(nc_def_dim(nc, "x", grid.nx, &xDim), "x dim");
  int xVar = 0, yVar = 0, bVar = 0, crs = 0;
  check(nc_def_var(nc, "x", NC_DOUBLE, 1, &xDim, &xVar), "x var");
  check(nc_def_var(nc, "y", NC_DOUBLE, 1, &yDim, &yVar), "y var");
  for (int v : {xVar, yVar}) {
    check(nc_put_att_text(nc, v, "units", 1, "m"), "units");
    check(nc_put_att_text(nc, v, "axis", 1, v == xVar ? "X" : "Y"), "axis");
    // A grid without a spacing (one node) gets none.
    if (grid.spacing > 0) {
      check(nc_put_att_double(nc, v, "spacing", NC_DOUBLE, 1, &grid.spacing), "spacing");
    }
  }
  const int dims[2] = {yDim, xDim};
  check(nc_def_var(nc, "bathymetry", NC_FLOAT, 2, dims, &bVar), "bathymetry var");
  const float fill = -1e-30f;
  check(nc_put_att_float(nc, bVar, "_FillValue", NC_FLOAT, 1, &fill), "fill");
  check(nc_put_att_text(nc, bVar, "units", 1, "m"), "units");
  check(nc_put_att_text(nc, bVar, "grid_mapping", 3, "crs"), "grid_mapping");
  check(nc_def_var(nc, "crs", NC_INT, 0, nullptr, &crs), "crs");
  check(nc_put_att_text(nc, crs, "projection", grid.projection.size(), grid.projection.c_str()),
        "projection");
  check(nc_put_att_double(nc, crs, "origin_longitude", NC_DOUBLE, 1, &grid.originLongitude),
        "lon");
  check(nc_put_att_double(nc, crs, "origin_latitude", NC_DOUBLE, 1, &grid.originLatitude),
        "lat");
  check(nc_put_att_double(nc, crs, "orientation", NC_DOUBLE, 1, &grid.orientation),
        "orientation");
  check(nc_put_att_text(nc, NC_GLOBAL, "Conventions", 6, "CF-1.8"), "conventions");
  const float misc[7] = {static_cast<float>(grid.orientation), -1e-30f, -900.0f, grid.landValue,
                         -1e-30f, -1e-30f, -1e-30f};
  check(nc_put_att_float(nc, NC_GLOBAL, "Q84_Misc", NC_FLOAT, 7, misc), "misc");
  check(nc_enddef(nc), "enddef");
  std::vector<double> xs(grid.nx), ys(grid.ny);
  for (int i = 0; i < grid.nx; ++i) xs[i] = i * grid.spacing;
  for (int j = 0; j < grid.ny; ++j) ys[j] = j * grid.spacing;
  check(nc_put_var_double(nc, xVar, xs.data()), "x values");
  check(nc_put_var_double(nc, yVar, ys.data()), "y values");
  if (grid.heights.size() != static_cast<std::size_t>(grid.nx) * grid.ny) {
    throw std::runtime_error("bathymetry heights do not match the grid");
  }
  check(nc_put_var_float(nc, bVar, grid.heights.data()), "heights");
  check(nc_close(nc), "close");
}

BathymetrySpec localBasin(int nx, int ny, double spacing, float height, double x0, double y0) {
  BathymetrySpec b;
  b.nx = nx;
  b.ny = ny;
  b.spacing = spacing;
  b.projection = "LOCAL";
  b.originLongitude = x0;
  b.originLatitude = y0;
  b.heights.assign(static_cast<std::size_t>(nx) * ny, height);
  return b;
}

std::string writeSmallCase(const TempDir& dir, const ParameterFile& parameters) {
  BathymetrySpec b = localBasin(30, 24, 250.0, 0.0f);
  for (int j = 0; j < b.ny; ++j) {
    for (int i = 0; i < b.nx; ++i) {
      const bool dry = i >= 25 && j >= 19;
      b.heights[static_cast<std::size_t>(j) * b.nx + i] =
          dry ? 10.0f : -(12.0f + static_cast<float>(i) * 0.5f);
    }
  }
  writeBathymetry(dir.file("bathymetry.nc"), b);
  std::ostringstream obs;
  obs.setf(std::ios::fixed);
  obs.precision(3);
  for (int j = 2; j < b.ny; j += 6) {
    for (int i = 1; i < 25; i += 5) {
      const double x = 1000.0 + i * 250.0;
      const double y = 2000.0 + j * 250.0;
      for (double z = -0.5; z > -(12.0 + i * 0.5); z -= 1.5) {
        obs << x << ' ' << y << ' ' << z << ' ' << (8.0 + 0.4 * z + 0.001 * (x - 1000.0)) << '\n';
      }
    }
  }
  writeFile(dir.file("observations.txt"), obs.str());
  writeFile(dir.file("case.pfs"), parameters.render());
  return obs.str();
}

std::vector<double> readVariable(const std::string& path, const char* name) {
  int nc = 0, var = 0, ndims = 0;
  std::vector<double> values;
  if (nc_open(path.c_str(), NC_NOWRITE, &nc) != NC_NOERR) return values;
  if (nc_inq_varid(nc, name, &var) == NC_NOERR && nc_inq_varndims(nc, var, &ndims) == NC_NOERR) {
    std::vector<int> dims(ndims);
    nc_inq_vardimid(nc, var, dims.data());
    std::size_t total = 1;
    for (int d : dims) {
      std::size_t length = 0;
      nc_inq_dimlen(nc, d, &length);
      total *= length;
    }
    values.resize(total);
    if (nc_get_var_double(nc, var, values.data()) != NC_NOERR) values.clear();
  }
  nc_close(nc);
  return values;
}

std::vector<float> readResult(const std::string& path, std::string* itemName, int shape[3]) {
  int nc = 0;
  check(nc_open(path.c_str(), NC_NOWRITE, &nc), "open result");
  int nvars = 0;
  check(nc_inq_nvars(nc, &nvars), "nvars");
  std::vector<float> values;
  for (int v = 0; v < nvars; ++v) {
    int ndims = 0;
    check(nc_inq_varndims(nc, v, &ndims), "ndims");
    if (ndims != 4) continue;
    char name[NC_MAX_NAME + 1];
    check(nc_inq_varname(nc, v, name), "name");
    if (itemName != nullptr) *itemName = name;
    int dims[4];
    check(nc_inq_vardimid(nc, v, dims), "dims");
    std::size_t count = 1;
    for (int d = 1; d < 4; ++d) {
      std::size_t len = 0;
      check(nc_inq_dimlen(nc, dims[d], &len), "dimlen");
      shape[d - 1] = static_cast<int>(len);
      count *= len;
    }
    values.resize(count);
    const std::size_t start[4] = {0, 0, 0, 0};
    const std::size_t counts[4] = {1, static_cast<std::size_t>(shape[0]),
                                   static_cast<std::size_t>(shape[1]),
                                   static_cast<std::size_t>(shape[2])};
    check(nc_get_vara_float(nc, v, start, counts, values.data()), "values");
    break;
  }
  nc_close(nc);
  return values;
}

}  // namespace karnet::e2e
