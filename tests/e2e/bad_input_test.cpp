// Bad input of every kind, end to end: each row spoils one thing in an otherwise sound small
// case and states the exit code and the message. Whatever a row expects, a failing run leaves
// every file it found as it was (an earlier result included) and writes nothing but its log.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cmath>
#include <cstdlib>
#include <filesystem>
#include <functional>
#include <map>
#include <string>
#include <vector>

#include "e2e/e2e_support.h"
#include "gridfile/nc_test_files.h"

namespace karnet::e2e {
namespace {

namespace fs = std::filesystem;

constexpr char kEarlierResult[] = "an earlier result, to be kept\n";

// A bathymetry in the layout karnet reads, with the item's declaration and the data section
// given by the caller; dimensions y and x of the given sizes (0: unlimited, left empty).
std::string bathymetryCdl(const std::string& dims, const std::string& item,
                          const std::string& extra = "", const std::string& data = "") {
  return "netcdf b {\ndimensions:\n" + dims +
         "variables:\n"
         "  double x(x) ; x:spacing = 250. ;\n"
         "  double y(y) ; y:spacing = 250. ;\n" +
         item +
         "  int crs ; crs:projection = \"LOCAL\" ; crs:origin_longitude = 1000. ;\n"
         "    crs:origin_latitude = 2000. ; crs:orientation = 0. ;\n" +
         extra +
         "  :Q84_Misc = 0.f, -1.e-30f, -900.f, 10.f, -1.e-30f, -1.e-30f, -1.e-30f ;\n" +
         (data.empty() ? "" : "data:\n" + data) + "}\n";
}

// A flat 4 x 3 bathymetry whose item has the given type and values.
std::string typedBathymetry(const std::string& type, const std::string& values) {
  return bathymetryCdl("  y = 3 ;\n  x = 4 ;\n",
                       "  " + type + " bathymetry(y, x) ; bathymetry:grid_mapping = \"crs\" ;\n",
                       "", " x = 0, 250, 500, 750 ;\n y = 0, 250, 500 ;\n bathymetry = " +
                               values + " ;\n");
}

void replaceInFile(const std::string& path, const std::string& from, const std::string& to) {
  std::string text = readFile(path);
  const auto at = text.find(from);
  if (at == std::string::npos) throw std::runtime_error("no '" + from + "' in " + path);
  text.replace(at, from.size(), to);
  writeFile(path, text);
}

void makeFifo(const std::string& path) {
  fs::remove(path);
  if (mkfifo(path.c_str(), 0600) != 0) throw std::runtime_error("mkfifo failed");
}

// The basin of writeSmallCase with every node set to one height.
void uniformBathymetry(const TempDir& d, float height) {
  writeBathymetry(d.file("bathymetry.nc"), localBasin(30, 24, 250.0, height));
}

using test::ncgen;
using P = ParameterFile&;
using D = const TempDir&;
using Spoil = std::function<void(D)>;

enum Flags : int {
  kResult = 1,     // the run writes a result
  kEmpty = 2,      // every node of that result holds the fill value
  kNotAsRoot = 4,  // permissions do not bind root
  kAtEcho = 8,     // the message is the first line after the echo of the parameter file
};

struct BadInput {
  const char* name;
  std::function<void(ParameterFile&)> edit;  // before the case is written
  Spoil spoil;                               // after: may change any file
  int exitCode;
  std::string logText;  // expected in the log
  // Expected in a line "karnet: ..." of the standard error stream ("" for none): the file that
  // stopped the run and why. Written also in batch mode, where the log's messages are not.
  std::string stderrText = {};
  int flags = 0;
};

const std::string kSuccess = "Completion code : Successful";

Spoil text(const std::string& name, const std::string& content) {
  return [=](D d) { writeFile(d.file(name), content); };
}
Spoil swapIn(const std::string& name, const std::string& from, const std::string& to) {
  return [=](D d) { replaceInFile(d.file(name), from, to); };
}
Spoil directoryAt(const std::string& name) {
  return [=](D d) {
    fs::remove(d.file(name));
    fs::create_directory(d.file(name));
  };
}
Spoil fifoAt(const std::string& name) {
  return [=](D d) { makeFifo(d.file(name)); };
}
// CR LF line ends; none after the last line unless lastEnd.
Spoil crlf(const std::string& name, bool lastEnd = true) {
  return [=](D d) {
    const auto lines = splitLines(readFile(d.file(name)));
    std::string out;
    for (std::size_t i = 0; i < lines.size(); ++i) {
      out += lines[i] + (lastEnd || i + 1 < lines.size() ? "\r\n" : "");
    }
    writeFile(d.file(name), out);
  };
}
// The observation file with content before its line `at` (counted from 0; -1: at the end).
Spoil insertObs(int at, const std::string& content) {
  return [=](D d) {
    const auto lines = splitLines(readFile(d.file("observations.txt")));
    std::string out;
    for (std::size_t i = 0; i < lines.size(); ++i) {
      if (static_cast<int>(i) == at) out += content;
      out += lines[i] + "\n";
    }
    writeFile(d.file("observations.txt"), at < 0 ? out + content : out);
  };
}

// True when a line of err starts with "karnet: " and holds text.
bool hasNoticeLine(const std::string& err, const std::string& text) {
  for (const std::string& line : splitLines(err)) {
    if (line.rfind("karnet: ", 0) == 0 && line.find(text) != std::string::npos) return true;
  }
  return false;
}

// The log lines after the echo's closing frame.
std::vector<std::string> linesAfterEcho(const std::string& log) {
  const auto lines = splitLines(log);
  std::size_t frames = 0;
  for (std::size_t i = 0; i < lines.size(); ++i) {
    if (lines[i] == std::string(70, '=') && ++frames == 2) {
      return std::vector<std::string>(lines.begin() + i + 1, lines.end());
    }
  }
  return {};
}

std::vector<BadInput> parameterFileRows() {
  std::string deep;
  for (int i = 0; i < 50; ++i) deep += "[LEVEL" + std::to_string(i) + "]\n";
  for (int i = 0; i < 50; ++i) deep += "EndSect\n";
  std::string binary;
  for (int i = 0; i < 4096; ++i) binary += static_cast<char>((i * 7919 + 13) % 256);
  const std::string noTarget = "target [Q4_DIGITIZING_OF_DATA] not found";
  const std::string notRegular = "Can't open case.pfs (not a regular file)";
  return {
      {"empty parameter file", {}, text("case.pfs", ""), 1, noTarget, "case.pfs:1: " + noTarget},
      {"binary parameter file", {}, text("case.pfs", binary), 1, "Error in parameter file",
       "case.pfs:1: NUL byte in the line"},
      {"sections 50 deep", {}, text("case.pfs", deep), 1, noTarget},
      {"target 50 sections deep", {},
       [](D d) {
         std::string text = readFile(d.file("case.pfs"));
         for (int i = 0; i < 50; ++i) text = "[OUTER" + std::to_string(i) + "]\n" + text + "EndSect\n";
         writeFile(d.file("case.pfs"), text);
       },
       1, noTarget},
      {"block never closed", {}, swapIn("case.pfs", "EndSect  // OUTPUT_DATA", ""), 1,
       "is not closed (EndSect missing)"},
      {"huge float", [](P p) { p.spacing = "1e39"; }, {}, 1, "not a number within the float range"},
      {"NaN as a word", [](P p) { p.spacing = "NaN"; }, {}, 1, "(the word NaN) is not a number"},
      {"nan as a text", [](P p) { p.decayDistance = "'nan'"; }, {}, 1, "is not a number"},
      {"inf as a word", [](P p) { p.searchRadius = "inf"; }, {}, 1, "(the word inf) is not a number"},
      {"unterminated bar", [](P p) { p.outputFileName = "|result.nc"; }, {}, 1,
       "unterminated file name"},
      {"projection too long", [](P p) { p.projection = "'" + std::string(1100, 'p') + "'"; }, {},
       1, "at most 1023 are allowed"},
      {"parameter file is a directory", {}, directoryAt("case.pfs"), 1, "Can't open case.pfs"},
      {"keyword with a bad value, named with its line", [](P p) { p.spacing = "abc"; }, {}, 1,
       "(the word abc) is not a number",
       "case.pfs:11: keyword Spacing: parameter 1 (the word abc) is not a number"},
      {"parameter file is a FIFO", {}, fifoAt("case.pfs"), 1, notRegular},
      {"CR LF line ends", {}, crlf("case.pfs"), 0, kSuccess, "", kResult},
  };
}

// Settings that cannot give a sound run are refused before any computing.
std::vector<BadInput> settingRows() {
  const std::string calculation = "ERROR: in calculation parameters";
  return {
      {"reversed level range", [](P p) { p.zRange = "9, 3"; }, {}, 1, "l0 = 9 lx = 3", "", kAtEcho},
      {"zero level spacing", [](P p) { p.spacing = "0"; }, {}, 1, "dz = 0.000000", "", kAtEcho},
      {"negative level spacing", [](P p) { p.spacing = "-2"; }, {}, 1, "dz = -2.000000", "",
       kAtEcho},
      {"negative search radius", [](P p) { p.searchRadius = "-1"; }, {}, 1, calculation, "",
       kAtEcho},
      {"negative extrapolation", [](P p) { p.maxExtrapolationDistance = "1, -1"; }, {}, 1,
       calculation, "", kAtEcho},
      {"error variance above 100", [](P p) { p.errorVariance = "100.5"; }, {}, 1, calculation, "",
       kAtEcho},
      {"no correlation samples", [](P p) { p.correlationSampleSize = "0"; }, {}, 1, calculation,
       "", kAtEcho},
      {"zero decay with objective analysis",
       [](P p) {
         p.analysis = "objective";
         p.decayDistance = "0";
       },
       {}, 1, calculation, "", kAtEcho},
      {"zero crossing with objective analysis",
       [](P p) {
         p.analysis = "objective";
         p.zeroCrossingDistance = "0";
       },
       {}, 1, calculation, "", kAtEcho},
      {"zero decay and crossing with bilinear analysis",
       [](P p) { p.decayDistance = p.zeroCrossingDistance = "0"; }, {}, 0, kSuccess, "", kResult},
      {"garbage projection", [](P p) { p.projection = "'+proj=nonsense +zone=99'"; }, {}, 1,
       "Unable to initialize geo. system", "", kAtEcho},
  };
}

std::vector<BadInput> observationRows() {
  const std::string waterError = "\nERROR while reading water file\n      line number: ";
  return {
      // The bytes after a NUL must not join the next line into a false observation.
      {"NUL byte hides a line end", {}, insertObs(0, std::string("1500 2500\0 junk\n-2 4\n", 21)),
       1, waterError + "1\n"},
      {"1 MB line of text", {}, insertObs(0, std::string(1 << 20, 'x') + "\n"), 1,
       waterError + "1\n"},
      {"1 MB of trailing text", {},
       insertObs(0, "1500 2500 -2 4 " + std::string(1 << 20, 'x') + "\n"), 0, kSuccess, "",
       kResult},
      {"inf", {}, insertObs(0, "1500 inf -2 4\n"), 1, waterError + "1\n",
       "observations.txt:1: not a finite number: \"inf\""},
      {"nan", {}, insertObs(6, "1500 3000 -2 nan\n"), 1, waterError + "7\n"},
      {"1e308", {}, insertObs(-1, "1e308 2500 -2 4\n"), 1, "\nERROR: basic grid too large\n"},
      {"-1e308 depth", {}, insertObs(-1, "1500 2500 -1e308 4\n"), 1,
       "\nERROR: basic grid too large\n"},
      {"three numbers", {}, insertObs(6, "1500 3000 -2\n"), 1, waterError + "7\n",
       "observations.txt:7: 4 numbers expected (x y z value), found 3"},
      {"blank line", {}, insertObs(6, "\n"), 1, waterError + "7\n", "observations.txt:7: empty line"},
      {"empty observation file", {}, text("observations.txt", ""), 0, kSuccess, "", kResult},
      {"all observations far outside", {}, text("observations.txt", "5e6 5e6 -2 4\n5e6 5e6 -4 3\n"),
       1, "\nERROR: basic grid too large\n"},
      {"all observations beside the grid", {},
       text("observations.txt", "20000 3000 -2 4\n20000 3000 -4 3\n"), 0,
       "No. of no interpolations", "", kResult},
      {"all observations on land", {},
       text("observations.txt", "8000 7500 -2 4\n8000 7500 -4 3\n"), 0,
       "No. of no interpolations", "", kResult},
      // Trailing text is ignored however long the line; the last line needs no line end.
      {"CR LF, a long line and no final line end", {},
       [](D d) {
         insertObs(3, "3000 3500 -2 7   " + std::string(200, '#') + "\n")(d);
         crlf("observations.txt", false)(d);
       },
       0, kSuccess, "", kResult},
      {"observation file missing", {}, [](D d) { fs::remove(d.file("observations.txt")); }, 1,
       "ERROR: in input file selection", "observations.txt: No such file or directory", kAtEcho},
      {"observation file is a directory", {}, directoryAt("observations.txt"), 1,
       "ERROR: in input file selection", "observations.txt: is a directory, not a regular file"},
      {"observation file is a FIFO", {}, fifoAt("observations.txt"), 1,
       "ERROR: in input file selection", "observations.txt: not a regular file"},
  };
}

std::vector<BadInput> bathymetryRows() {
  auto nc = [](const std::string& cdl, const std::string& kind = "nc4") {
    return [cdl, kind](D d) { ncgen(d.file("bathymetry.nc"), cdl, kind); };
  };
  const std::string unread = "dx = -0.000000 dy = -0.000000";
  const std::string cantRead = "bathymetry.nc: cannot be read as NetCDF: ";
  const std::string tooShort = "bathymetry.nc: its NetCDF header declares more than the file holds";
  const std::string no2d = "bathymetry.nc: no usable 2-D item";
  const std::string item2d = "  float bathymetry(y, x) ; bathymetry:grid_mapping = \"crs\" ;\n";
  const std::string dims = "  y = 3 ;\n  x = 4 ;\n";
  const std::string heights = "-5, -10, -12, -9, -7, -20, -25, -4, -3, -8, -6, -2";
  return {
      {"truncated bathymetry", {},
       [](D d) {
         const std::string bytes = readFile(d.file("bathymetry.nc"));
         writeFile(d.file("bathymetry.nc"), bytes.substr(0, bytes.size() / 2));
       },
       1, unread, cantRead},
      // A 613-byte classic file whose header declares an attribute of 6.7 GB.
      {"bathymetry declaring gigabytes", {},
       [](D d) {
         fs::copy_file(std::string(KARNET_SOURCE_DIR) +
                           "/tests/fuzz/regressions/bathymetry_huge_attribute.nc",
                       d.file("bathymetry.nc"), fs::copy_options::overwrite_existing);
       },
       1, unread, tooShort},
      // The header is whole, the last heights are missing: they must not read as zeros.
      {"classic bathymetry cut in its values", {},
       [heights](D d) {
         ncgen(d.file("bathymetry.nc"), typedBathymetry("float", heights), "classic");
         const std::string bytes = readFile(d.file("bathymetry.nc"));
         writeFile(d.file("bathymetry.nc"), bytes.substr(0, bytes.size() - 8));
       },
       1, unread, tooShort},
      {"text as bathymetry", {}, text("bathymetry.nc", "CDF\x01 garbage"), 1, unread, tooShort,
       kAtEcho},
      {"plain text as bathymetry", {}, text("bathymetry.nc", "not a grid\n"), 1, unread, "",
       kAtEcho},
      {"empty bathymetry file", {}, text("bathymetry.nc", ""), 1, unread, cantRead},
      {"HDF5 file without variables", {}, nc("netcdf e {\ndimensions:\n  x = 4 ;\n}\n"), 1,
       unread, "bathymetry.nc: no 2-D item"},
      {"1-D item", {},
       nc(bathymetryCdl(dims, "  float bathymetry(x) ; bathymetry:grid_mapping = \"crs\" ;\n")), 1,
       unread, no2d},
      {"3-D item", {},
       nc(bathymetryCdl(dims + "  z = 2 ;\n",
                        "  float bathymetry(z, y, x) ; bathymetry:grid_mapping = \"crs\" ;\n")),
       1, unread, no2d},
      {"zero-size dimension", {}, nc(bathymetryCdl("  y = 3 ;\n  x = UNLIMITED ;\n", item2d)), 1,
       unread, no2d},
      {"huge declared dimensions", {},
       nc(bathymetryCdl("  y = 50000 ;\n  x = 50000 ;\n",
                        item2d + "    bathymetry:_Storage = \"chunked\" ;"
                                 " bathymetry:_ChunkSizes = 500, 500 ;\n")),
       1, unread, no2d},
      {"NaN spacing", {}, nc(bathymetryCdl(dims, item2d, "  x:spacing = NaN ;\n")), 1, unread,
       no2d},
      {"negative spacing", {}, nc(bathymetryCdl(dims, item2d, "  y:spacing = -250. ;\n")), 1,
       unread, no2d},
      {"uneven coordinates", {},
       nc("netcdf b {\ndimensions:\n  y = 3 ;\n  x = 4 ;\nvariables:\n  double x(x) ;\n"
          "  double y(y) ;\n  float bathymetry(y, x) ;\n  int crs ; crs:projection = \"LOCAL\" ;\n"
          "  crs:origin_longitude = 1000. ; crs:origin_latitude = 2000. ; crs:orientation = 0. ;\n"
          "data:\n x = 0, 250, 600, 750 ;\n y = 0, 250, 500 ;\n}\n"),
       1, unread, no2d},
      {"char values", {},
       nc(bathymetryCdl(dims, "  char bathymetry(y, x) ; bathymetry:grid_mapping = \"crs\" ;\n")),
       1, unread, no2d},
      {"unusable packing", {},
       nc(bathymetryCdl(dims, "  short bathymetry(y, x) ; bathymetry:scale_factor = \"big\" ;\n")),
       1, unread, no2d},
      {"no crs variable", {},
       nc("netcdf b {\ndimensions:\n  y = 3 ;\n  x = 4 ;\nvariables:\n  float bathymetry(y, x) ;\n"
          "  double x(x) ; x:spacing = 250. ;\n  double y(y) ; y:spacing = 250. ;\n}\n"),
       1, "\nERROR while reading bathymetry file\n", "bathymetry.nc: no crs variable with projection"},
      // A single node: neither axis has a spacing.
      {"one node", {},
       [](D d) { writeBathymetry(d.file("bathymetry.nc"), localBasin(1, 1, 0.0, -10.0f)); },
       1, "dx = 0.000000 dy = 0.000000", "", kAtEcho},
      {"int64 values", {}, nc(typedBathymetry("int64", heights)), 0, kSuccess, "", kResult},
      {"classic format", {}, nc(typedBathymetry("float", heights), "classic"), 0, kSuccess, "",
       kResult},
      // The run takes its projection from the parameter file; the bathymetry's text is not used.
      {"garbage projection in the bathymetry", {},
       [](D d) {
         BathymetrySpec b = localBasin(4, 3, 250.0, -10.0f);
         b.projection = "+proj=nonsense +zone=99";
         writeBathymetry(d.file("bathymetry.nc"), b);
       },
       0, kSuccess, "", kResult},
      // No wet node: the run completes with a result that holds no estimate.
      {"all land", {}, [](D d) { uniformBathymetry(d, 10.0f); }, 0,
       "No. of bilinear interpolations          : 0", "", kResult | kEmpty},
      {"all NaN", {}, [](D d) { uniformBathymetry(d, std::nanf("")); }, 0,
       "No. of bilinear interpolations          : 0", "", kResult | kEmpty},
      {"bathymetry missing", [](P p) { p.fileName = "|nowhere.nc|"; }, {}, 1,
       "ERROR: in input file selection", "", kAtEcho},
      {"bathymetry is a FIFO", {}, fifoAt("bathymetry.nc"), 1, "ERROR: in input file selection",
       "bathymetry.nc: not a regular file"},
  };
}

std::vector<BadInput> outputRows() {
  const std::string ownFile = "is one of the run's own files";
  const std::string writeError = "ERROR while writing result file";
  return {
      {"output directory missing", [](P p) { p.outputFileName = "|nowhere/result.nc|"; }, {}, 1,
       writeError, "nowhere/result.nc: No such file or directory"},
      {"read-only output directory", [](P p) { p.outputFileName = "|locked/result.nc|"; },
       [](D d) {
         fs::create_directory(d.file("locked"));
         writeFile(d.file("locked/result.nc"), kEarlierResult);
         fs::permissions(d.file("locked"), fs::perms::owner_read | fs::perms::owner_exec);
       },
       1, writeError, "locked/result.nc: Permission denied", kNotAsRoot},
      {"output path is a directory", [](P p) { p.outputFileName = "|out|"; },
       [](D d) { fs::create_directory(d.file("out")); }, 1, writeError, "out: is a directory"},
      {"output path ends in a slash", [](P p) { p.outputFileName = "|out/|"; }, {}, 1, writeError,
       "out/: the name ends in '/' (a directory)"},
      {"output under a file", [](P p) { p.outputFileName = "|observations.txt/result.nc|"; }, {},
       1, writeError, "observations.txt/result.nc: observations.txt is not a directory"},
      {"output is the bathymetry", [](P p) { p.outputFileName = "|bathymetry.nc|"; }, {}, 1,
       ownFile},
      {"output is the observation file", [](P p) { p.outputFileName = "|observations.txt|"; }, {},
       1, ownFile},
      {"output is the parameter file", [](P p) { p.outputFileName = "|case.pfs|"; }, {}, 1,
       ownFile},
      {"output is the log", [](P p) { p.outputFileName = "|case.log|"; },
       text("case.log", "an old log\n"), 1, ownFile},
      {"output is the bathymetry by another name",
       [](P p) { p.outputFileName = "|./sub/../bathymetry.nc|"; },
       [](D d) { fs::create_directory(d.file("sub")); }, 1, ownFile},
      {"output is a link to the observations", [](P p) { p.outputFileName = "|link.txt|"; },
       [](D d) { fs::create_symlink(d.file("observations.txt"), d.file("link.txt")); }, 1,
       ownFile},
  };
}

// Regular files and their contents, for the before-and-after comparison.
std::map<std::string, std::string> snapshot(const TempDir& dir) {
  std::map<std::string, std::string> files;
  for (const auto& entry : fs::recursive_directory_iterator(dir.path())) {
    if (entry.is_symlink() || !entry.is_regular_file()) continue;
    files[fs::relative(entry.path(), dir.path()).string()] = readFile(entry.path().string());
  }
  return files;
}

void runRow(const BadInput& row) {
  SCOPED_TRACE(row.name);
  if ((row.flags & kNotAsRoot) != 0 && geteuid() == 0) return;
  const bool writesResult = (row.flags & kResult) != 0;
  TempDir dir;
  ParameterFile p;
  if (row.edit) row.edit(p);
  writeSmallCase(dir, p);
  writeFile(dir.file("result.nc"), kEarlierResult);
  if (row.spoil) row.spoil(dir);
  const auto before = snapshot(dir);

  const ProcessResult r =
      runProgram(KARNET_BINARY, {"case.pfs"}, dir.path(), kBatch, {}, 30);
  const std::string log = readFile(dir.file("case.log"));
  EXPECT_EQ(r.termSignal, 0) << "killed: a crash or a hang";
  EXPECT_EQ(r.exitCode, row.exitCode) << log;
  EXPECT_TRUE(contains(log, row.logText)) << "log lacks: " << row.logText << "\n" << log;
  if ((row.flags & kAtEcho) != 0) {
    const auto after = linesAfterEcho(log);
    ASSERT_FALSE(after.empty()) << log;
    EXPECT_EQ(after[0], row.logText);
  }
  if (!row.stderrText.empty()) {
    EXPECT_TRUE(hasNoticeLine(r.err, row.stderrText))
        << "no line \"karnet: ...\" with: " << row.stderrText << "\n" << r.err;
  }
  EXPECT_NE(log.find(row.exitCode == 0 ? "-- Completion code : Successful"
                                        : "-- Completion code : Abnormal"),
            std::string::npos)
      << log;

  const auto after = snapshot(dir);
  for (const auto& [name, content] : before) {
    if (name == "case.log" || (writesResult && name == "result.nc")) continue;
    const auto found = after.find(name);
    ASSERT_NE(found, after.end()) << name << " was removed";
    EXPECT_TRUE(found->second == content) << name << " was changed";
  }
  for (const auto& [name, content] : after) {
    if (name == "case.log" || before.count(name) != 0) continue;
    ADD_FAILURE() << "new file " << name;
  }
  if (writesResult) {
    int shape[3] = {0, 0, 0};
    const std::vector<float> values = readResult(dir.file("result.nc"), nullptr, shape);
    EXPECT_EQ(shape[0], 12);
    EXPECT_EQ(values.size(), static_cast<std::size_t>(shape[0]) * shape[1] * shape[2]);
    EXPECT_FALSE(values.empty());
    if ((row.flags & kEmpty) != 0) {
      for (float v : values) ASSERT_EQ(v, -1e-30f);
    }
  }
}

TEST(BadInput, ParameterFiles) {
  for (BadInput row : parameterFileRows()) {
    // What the log says about a parameter file that cannot be read is also on the standard
    // error stream (the rows named in parameterFileRows give the whole line).
    if (row.exitCode == 1 && row.stderrText.empty()) {
      row.stderrText = row.logText;
    }
    runRow(row);
  }
}

TEST(BadInput, ObservationFiles) {
  for (const BadInput& row : observationRows()) runRow(row);
}

TEST(BadInput, Settings) {
  for (const BadInput& row : settingRows()) runRow(row);
}

TEST(BadInput, BathymetryFiles) {
  for (const BadInput& row : bathymetryRows()) runRow(row);
}

TEST(BadInput, AnInputNamedLikeTheLogIsKept) {
  // The log takes the parameter file's name with .log. Were an input of that name emptied for
  // the log, the run would destroy it (and then fail on an empty file): the run stops instead,
  // says why on the standard error stream and leaves the file, and an earlier result, alone.
  struct Row {
    const char* name;
    std::function<void(ParameterFile&)> edit;
    const char* input;     // copied to case.log before the run
    const char* parameters;  // the parameter file's name
  };
  const Row rows[] = {
      {"observations", [](ParameterFile& p) { p.dataFileName = "|case.log|"; }, "observations.txt",
       "case.pfs"},
      {"bathymetry", [](ParameterFile& p) { p.fileName = "|case.log|"; }, "bathymetry.nc",
       "case.pfs"},
      {"the parameter file itself", {}, "case.pfs", "case.log"},
  };
  for (const Row& row : rows) {
    SCOPED_TRACE(row.name);
    TempDir dir;
    ParameterFile p;
    if (row.edit) row.edit(p);
    writeSmallCase(dir, p);
    writeFile(dir.file("result.nc"), kEarlierResult);
    const std::string input = readFile(dir.file(row.input));
    writeFile(dir.file("case.log"), input);
    const ProcessResult r = runProgram(KARNET_BINARY, {row.parameters}, dir.path(), kBatch, {}, 30);
    EXPECT_EQ(r.termSignal, 0);
    EXPECT_EQ(r.exitCode, 1) << r.err;
    EXPECT_TRUE(readFile(dir.file("case.log")) == input) << "the input was changed";
    EXPECT_TRUE(contains(r.err, "log")) << r.err;
    EXPECT_EQ(readFile(dir.file("result.nc")), kEarlierResult);
  }
}

TEST(BadInput, ResultFiles) {
  for (const BadInput& row : outputRows()) runRow(row);
}

}  // namespace
}  // namespace karnet::e2e
