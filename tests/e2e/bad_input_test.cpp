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

namespace karnet::e2e {
namespace {

namespace fs = std::filesystem;

constexpr char kEarlierResult[] = "an earlier result, to be kept\n";

// Writes a NetCDF file from CDL text with ncgen (kind: classic, nc4, ...).
void ncgen(const std::string& path, const std::string& cdl, const std::string& kind = "nc4") {
  const std::string cdlPath = path + ".cdl";
  writeFile(cdlPath, cdl);
  const std::string command = "ncgen -k " + kind + " -o '" + path + "' '" + cdlPath + "'";
  if (std::system(command.c_str()) != 0) throw std::runtime_error("ncgen failed: " + cdl);
  fs::remove(cdlPath);
}

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
  BathymetrySpec b;
  b.nx = 30;
  b.ny = 24;
  b.projection = "LOCAL";
  b.originLongitude = 1000.0;
  b.originLatitude = 2000.0;
  b.heights.assign(30 * 24, height);
  writeBathymetry(d.file("bathymetry.nc"), b);
}

struct BadInput {
  const char* name;
  std::function<void(ParameterFile&)> edit;   // before the case is written
  std::function<void(const TempDir&)> spoil;  // after: may change any file
  int exitCode;
  std::string logText;  // expected in the log ("" for none)
  bool writesResult = false;
  bool emptyResult = false;  // every node of the result holds the fill value
  bool notAsRoot = false;    // permissions do not bind root
};

using P = ParameterFile&;
using D = const TempDir&;

std::vector<BadInput> parameterFileRows() {
  auto pfs = [](const std::string& text) {
    return [text](D d) { writeFile(d.file("case.pfs"), text); };
  };
  auto swapInPfs = [](const std::string& from, const std::string& to) {
    return [from, to](D d) { replaceInFile(d.file("case.pfs"), from, to); };
  };
  std::string deep;
  for (int i = 0; i < 50; ++i) deep += "[LEVEL" + std::to_string(i) + "]\n";
  for (int i = 0; i < 50; ++i) deep += "EndSect\n";
  std::string binary;
  for (int i = 0; i < 4096; ++i) binary += static_cast<char>((i * 7919 + 13) % 256);
  return {
      {"empty parameter file", {}, pfs(""), 1, "target [Q4_DIGITIZING_OF_DATA] not found"},
      {"binary parameter file", {}, pfs(binary), 1, "Error in parameter file"},
      {"sections 50 deep", {}, pfs(deep), 1, "target [Q4_DIGITIZING_OF_DATA] not found"},
      {"target 50 sections deep", {},
       [](D d) {
         std::string text = readFile(d.file("case.pfs"));
         for (int i = 0; i < 50; ++i) text = "[OUTER" + std::to_string(i) + "]\n" + text + "EndSect\n";
         writeFile(d.file("case.pfs"), text);
       },
       1, "target [Q4_DIGITIZING_OF_DATA] not found"},
      {"block never closed", {}, swapInPfs("EndSect  // OUTPUT_DATA", ""), 1,
       "is not closed (EndSect missing)"},
      {"EndSect without a block", {}, pfs("EndSect\n"), 1, "EndSect without an open block"},
      {"keyword outside any block", {}, pfs("Spacing = 2\n"), 1, "outside of any block"},
      {"NUL byte", {}, swapInPfs("Title", std::string("Ti\0tle", 6)), 1, "NUL byte in the line"},
      {"huge float", [](P p) { p.spacing = "1e39"; }, {}, 1, "not a number within the float range"},
      {"huge double", [](P p) { p.searchRadius = "1e400"; }, {}, 1,
       "not a number within the float range"},
      {"huge integer", [](P p) { p.zRange = "0, 99999999999"; }, {}, 1,
       "not an integer within 32 bits"},
      {"NaN as a word", [](P p) { p.spacing = "NaN"; }, {}, 1, "(the word NaN) is not a number"},
      {"nan as a text", [](P p) { p.decayDistance = "'nan'"; }, {}, 1, "is not a number"},
      {"inf as a word", [](P p) { p.searchRadius = "inf"; }, {}, 1, "(the word inf) is not a number"},
      {"integer with a fraction", [](P p) { p.itemType = "2.5"; }, {}, 1, "is not an integer"},
      {"one value for a pair", [](P p) { p.zRange = "3"; }, {}, 1, "has 1 value, 2 expected"},
      {"unterminated quote", [](P p) { p.title = "'no end"; }, {}, 1, "unterminated text"},
      {"unterminated bar", [](P p) { p.outputFileName = "|result.nc"; }, {}, 1,
       "unterminated file name"},
      {"file name too long", [](P p) { p.dataFileName = "|" + std::string(300, 'a') + "|"; }, {},
       1, "at most 259 are allowed"},
      {"projection too long", [](P p) { p.projection = "'" + std::string(1100, 'p') + "'"; }, {},
       1, "at most 1023 are allowed"},
      {"missing keyword", {}, swapInPfs("Spacing = 2.5", ""), 1, "keyword Spacing not found"},
      {"missing section", [](P p) { p.omit = {"OUTPUT_DATA"}; }, {}, 1,
       "section [OUTPUT_DATA] not found"},
      {"other target name", {}, swapInPfs("[Q4_DIGITIZING_OF_DATA]", "[Q5]"), 1,
       "target [Q4_DIGITIZING_OF_DATA] not found"},
      {"parameter file is a directory", {},
       [](D d) {
         fs::remove(d.file("case.pfs"));
         fs::create_directory(d.file("case.pfs"));
       },
       1, "Can't open case.pfs"},
      {"parameter file is /dev/zero", {},
       [](D d) {
         fs::remove(d.file("case.pfs"));
         fs::create_symlink("/dev/zero", d.file("case.pfs"));
       },
       1, "Can't open case.pfs (not a regular file)"},
      {"parameter file is a FIFO", {}, [](D d) { makeFifo(d.file("case.pfs")); }, 1,
       "Can't open case.pfs (not a regular file)"},
      {"parameter file larger than 64 MiB", {},
       [](D d) { fs::resize_file(d.file("case.pfs"), (std::uintmax_t{64} << 20) + 1); }, 1,
       "Can't open case.pfs (larger than"},
      {"CR LF line ends", {},
       [](D d) {
         std::string crlf;
         for (const std::string& line : splitLines(readFile(d.file("case.pfs")))) {
           crlf += line + "\r\n";
         }
         writeFile(d.file("case.pfs"), crlf);
       },
       0, "Completion code : Successful", true},
      {"byte order mark", {},
       [](D d) { writeFile(d.file("case.pfs"), "\xEF\xBB\xBF" + readFile(d.file("case.pfs"))); },
       0, "Completion code : Successful", true},
      {"level range beyond memory", [](P p) { p.zRange = "0, 2000000000"; }, {}, 1,
       "ERROR: Unable to allocate memory"},
  };
}

std::vector<BadInput> observationRows() {
  auto obs = [](const std::string& text) {
    return [text](D d) { writeFile(d.file("observations.txt"), text); };
  };
  auto appendObs = [](const std::string& text) {
    return [text](D d) { writeFile(d.file("observations.txt"), readFile(d.file("observations.txt")) + text); };
  };
  auto prependObs = [](const std::string& text) {
    return [text](D d) { writeFile(d.file("observations.txt"), text + readFile(d.file("observations.txt"))); };
  };
  const std::string waterError = "\nERROR while reading water file\n      line number: ";
  return {
      {"NUL byte inside a line", {}, prependObs(std::string("1500 2500 -2\0 4\n", 16)), 1,
       waterError + "1\n"},
      // The bytes after a NUL must not join the next line into a false observation.
      {"NUL byte hides a line end", {},
       prependObs(std::string("1500 2500\0 junk\n-2 4\n", 21)), 1, waterError + "1\n"},
      {"1 MB line of text", {}, prependObs(std::string(1 << 20, 'x') + "\n"), 1,
       waterError + "1\n"},
      {"1 MB of trailing text", {},
       prependObs("1500 2500 -2 4 " + std::string(1 << 20, 'x') + "\n"), 0,
       "Completion code : Successful", true},
      {"inf", {}, prependObs("1500 inf -2 4\n"), 1, waterError + "1\n"},
      {"-infinity", {}, prependObs("1500 2500 -infinity 4\n"), 1, waterError + "1\n"},
      {"nan", {}, appendObs("1500 2500 -2 nan\n"), 1, waterError},
      {"number beyond double", {}, prependObs("1e999 2500 -2 4\n"), 1, waterError + "1\n"},
      {"1e308", {}, appendObs("1e308 2500 -2 4\n"), 1, "\nERROR: basic grid too large\n"},
      {"-1e308 depth", {}, appendObs("1500 2500 -1e308 4\n"), 1,
       "\nERROR: basic grid too large\n"},
      {"three numbers", {}, prependObs("1500 2500 -2\n"), 1, waterError + "1\n"},
      {"blank line", {}, prependObs("\n"), 1, waterError + "1\n"},
      {"header line", {}, prependObs("x y z temperature\n"), 1, waterError + "1\n"},
      {"binary observation file", {}, obs(std::string("\x7f" "ELF\x02\x01\x01\0\0\0", 10)), 1,
       waterError + "1\n"},
      {"empty observation file", {}, obs(""), 0, "Completion code : Successful", true},
      {"all observations far outside", {},
       obs("5e6 5e6 -2 4\n5e6 5e6 -4 3\n"), 1, "\nERROR: basic grid too large\n"},
      {"all observations beside the grid", {},
       obs("20000 3000 -2 4\n20000 3000 -4 3\n"), 0, "No. of no interpolations", true},
      {"all observations on land", {},
       obs("8000 7500 -2 4\n8000 7500 -4 3\n"), 0, "No. of no interpolations", true},
      {"CR LF observation file", {},
       [](D d) {
         std::string crlf;
         for (const std::string& line : splitLines(readFile(d.file("observations.txt")))) {
           crlf += line + "\r\n";
         }
         writeFile(d.file("observations.txt"), crlf);
       },
       0, "Completion code : Successful", true},
      {"observation file missing", {}, [](D d) { fs::remove(d.file("observations.txt")); }, 1,
       "ERROR: in input file selection"},
      {"observation file is a directory", {},
       [](D d) {
         fs::remove(d.file("observations.txt"));
         fs::create_directory(d.file("observations.txt"));
       },
       1, "ERROR: in input file selection"},
      {"observation file is a FIFO", {}, [](D d) { makeFifo(d.file("observations.txt")); }, 1,
       "ERROR: in input file selection"},
      {"observation file is /dev/zero", {},
       [](D d) {
         fs::remove(d.file("observations.txt"));
         fs::create_symlink("/dev/zero", d.file("observations.txt"));
       },
       1, "ERROR: in input file selection"},
  };
}

std::vector<BadInput> bathymetryRows() {
  auto nc = [](const std::string& cdl, const std::string& kind = "nc4") {
    return [cdl, kind](D d) { ncgen(d.file("bathymetry.nc"), cdl, kind); };
  };
  const std::string unread = "dx = -0.000000 dy = -0.000000";
  const std::string item2d = "  float bathymetry(y, x) ; bathymetry:grid_mapping = \"crs\" ;\n";
  return {
      {"truncated bathymetry", {},
       [](D d) {
         const std::string bytes = readFile(d.file("bathymetry.nc"));
         writeFile(d.file("bathymetry.nc"), bytes.substr(0, bytes.size() / 2));
       },
       1, unread},
      // A 613-byte classic file whose header declares an attribute of 6.7 GB.
      {"bathymetry declaring gigabytes", {},
       [](D d) {
         fs::copy_file(std::string(KARNET_SOURCE_DIR) +
                           "/tests/fuzz/regressions/bathymetry_huge_attribute.nc",
                       d.file("bathymetry.nc"), fs::copy_options::overwrite_existing);
       },
       1, unread},
      // The header is whole, the last heights are missing: they must not read as zeros.
      {"classic bathymetry cut in its values", {},
       [](D d) {
         ncgen(d.file("bathymetry.nc"),
               typedBathymetry("float", "-5, -10, -12, -9, -7, -20, -25, -4, -3, -8, -6, -2"),
               "classic");
         const std::string bytes = readFile(d.file("bathymetry.nc"));
         writeFile(d.file("bathymetry.nc"), bytes.substr(0, bytes.size() - 8));
       },
       1, unread},
      {"text as bathymetry", {}, [](D d) { writeFile(d.file("bathymetry.nc"), "CDF\x01 garbage"); },
       1, unread},
      {"empty bathymetry file", {}, [](D d) { writeFile(d.file("bathymetry.nc"), ""); }, 1, unread},
      {"HDF5 file without variables", {}, nc("netcdf e {\ndimensions:\n  x = 4 ;\n}\n"), 1, unread},
      {"1-D item", {},
       nc(bathymetryCdl("  y = 3 ;\n  x = 4 ;\n",
                        "  float bathymetry(x) ; bathymetry:grid_mapping = \"crs\" ;\n")),
       1, unread},
      {"3-D item", {},
       nc(bathymetryCdl("  y = 3 ;\n  x = 4 ;\n  z = 2 ;\n",
                        "  float bathymetry(z, y, x) ; bathymetry:grid_mapping = \"crs\" ;\n")),
       1, unread},
      {"zero-size dimension", {},
       nc(bathymetryCdl("  y = 3 ;\n  x = UNLIMITED ;\n", item2d)), 1, unread},
      {"huge declared dimensions", {},
       nc(bathymetryCdl("  y = 50000 ;\n  x = 50000 ;\n",
                        "  float bathymetry(y, x) ; bathymetry:grid_mapping = \"crs\" ;\n"
                        "    bathymetry:_Storage = \"chunked\" ; bathymetry:_ChunkSizes = 500, 500 ;\n")),
       1, unread},
      {"NaN spacing", {},
       nc(bathymetryCdl("  y = 3 ;\n  x = 4 ;\n", item2d, "  x:spacing = NaN ;\n")), 1, unread},
      {"negative spacing", {},
       nc(bathymetryCdl("  y = 3 ;\n  x = 4 ;\n", item2d, "  y:spacing = -250. ;\n")), 1, unread},
      {"uneven coordinates", {},
       nc("netcdf b {\ndimensions:\n  y = 3 ;\n  x = 4 ;\nvariables:\n  double x(x) ;\n"
          "  double y(y) ;\n  float bathymetry(y, x) ;\n  int crs ; crs:projection = \"LOCAL\" ;\n"
          "  crs:origin_longitude = 1000. ; crs:origin_latitude = 2000. ; crs:orientation = 0. ;\n"
          "data:\n x = 0, 250, 600, 750 ;\n y = 0, 250, 500 ;\n}\n"),
       1, unread},
      {"char values", {},
       nc(bathymetryCdl("  y = 3 ;\n  x = 4 ;\n",
                        "  char bathymetry(y, x) ; bathymetry:grid_mapping = \"crs\" ;\n")),
       1, unread},
      {"unusable packing", {},
       nc(bathymetryCdl("  y = 3 ;\n  x = 4 ;\n",
                        "  short bathymetry(y, x) ; bathymetry:scale_factor = \"big\" ;\n")),
       1, unread},
      {"no crs variable", {},
       nc("netcdf b {\ndimensions:\n  y = 3 ;\n  x = 4 ;\nvariables:\n  float bathymetry(y, x) ;\n"
          "  double x(x) ; x:spacing = 250. ;\n  double y(y) ; y:spacing = 250. ;\n}\n"),
       1, "\nERROR while reading bathymetry file\n"},
      {"int64 values", {}, nc(typedBathymetry("int64", "-5, -10, -12, -9, -7, -20, -25, -4, -3, -8, -6, -2")),
       0, "Completion code : Successful", true},
      {"classic format", {},
       nc(typedBathymetry("float", "-5, -10, -12, -9, -7, -20, -25, -4, -3, -8, -6, -2"), "classic"),
       0, "Completion code : Successful", true},
      {"garbage projection", [](P p) { p.projection = "'+proj=nonsense +zone=99'"; }, {}, 1,
       "Unable to initialize geo. system"},
      // The run takes its projection from the parameter file; the bathymetry's text is not used.
      {"garbage projection in the bathymetry", {},
       [](D d) {
         BathymetrySpec b;
         b.nx = 4;
         b.ny = 3;
         b.projection = "+proj=nonsense +zone=99";
         b.heights.assign(12, -10.0f);
         writeBathymetry(d.file("bathymetry.nc"), b);
       },
       0, "Completion code : Successful", true},
      // No wet node: the run completes with a result that holds no estimate.
      {"all land", {}, [](D d) { uniformBathymetry(d, 10.0f); }, 0,
       "No. of bilinear interpolations          : 0", true, true},
      {"all NaN", {}, [](D d) { uniformBathymetry(d, std::nanf("")); }, 0,
       "No. of bilinear interpolations          : 0", true, true},
      {"bathymetry is a FIFO", {}, [](D d) { makeFifo(d.file("bathymetry.nc")); }, 1,
       "ERROR: in input file selection"},
      {"bathymetry is a directory", {},
       [](D d) {
         fs::remove(d.file("bathymetry.nc"));
         fs::create_directory(d.file("bathymetry.nc"));
       },
       1, "ERROR: in input file selection"},
  };
}

std::vector<BadInput> outputRows() {
  const std::string ownFile = "is one of the run's own files";
  return {
      {"output directory missing", [](P p) { p.outputFileName = "|nowhere/result.nc|"; }, {}, 1,
       "ERROR while writing result file"},
      {"read-only output directory", [](P p) { p.outputFileName = "|locked/result.nc|"; },
       [](D d) {
         fs::create_directory(d.file("locked"));
         writeFile(d.file("locked/result.nc"), kEarlierResult);
         fs::permissions(d.file("locked"), fs::perms::owner_read | fs::perms::owner_exec);
       },
       1, "ERROR while writing result file", false, false, true},
      {"output path is a directory", [](P p) { p.outputFileName = "|out|"; },
       [](D d) { fs::create_directory(d.file("out")); }, 1, "ERROR while writing result file"},
      {"output path ends in a slash", [](P p) { p.outputFileName = "|out/|"; }, {}, 1,
       "ERROR while writing result file"},
      {"output under a file", [](P p) { p.outputFileName = "|observations.txt/result.nc|"; }, {},
       1, "ERROR while writing result file"},
      {"output is the bathymetry", [](P p) { p.outputFileName = "|bathymetry.nc|"; }, {}, 1,
       ownFile},
      {"output is the observation file", [](P p) { p.outputFileName = "|observations.txt|"; }, {},
       1, ownFile},
      {"output is the parameter file", [](P p) { p.outputFileName = "|case.pfs|"; }, {}, 1,
       ownFile},
      {"output is the log", [](P p) { p.outputFileName = "|case.log|"; },
       [](D d) { writeFile(d.file("case.log"), "an old log\n"); }, 1, ownFile},
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
    if (entry.file_size() > (std::uintmax_t{16} << 20)) continue;  // the sparse 64 MiB file
    files[fs::relative(entry.path(), dir.path()).string()] = readFile(entry.path().string());
  }
  return files;
}

void runRow(const BadInput& row) {
  SCOPED_TRACE(row.name);
  if (row.notAsRoot && geteuid() == 0) return;
  TempDir dir;
  ParameterFile p;
  p.projection = "'LOCAL'";
  if (row.edit) row.edit(p);
  writeSmallCase(dir, p);
  writeFile(dir.file("result.nc"), kEarlierResult);
  if (row.spoil) row.spoil(dir);
  const auto before = snapshot(dir);

  const ProcessResult r =
      runProgram(KARNET_BINARY, {"case.pfs"}, dir.path(), {{"buildmode", "nigth"}}, {}, 30);
  const std::string log = readFile(dir.file("case.log"));
  EXPECT_EQ(r.termSignal, 0) << "killed: a crash or a hang";
  EXPECT_EQ(r.exitCode, row.exitCode) << log;
  EXPECT_NE(log.find(row.logText), std::string::npos) << "log lacks: " << row.logText << "\n"
                                                       << log;
  EXPECT_NE(log.find(row.exitCode == 0 ? "-- Completion code : Successful"
                                        : "-- Completion code : Abnormal"),
            std::string::npos)
      << log;

  const auto after = snapshot(dir);
  for (const auto& [name, content] : before) {
    if (name == "case.log" || (row.writesResult && name == "result.nc")) continue;
    const auto found = after.find(name);
    ASSERT_NE(found, after.end()) << name << " was removed";
    EXPECT_TRUE(found->second == content) << name << " was changed";
  }
  for (const auto& [name, content] : after) {
    if (name == "case.log" || before.count(name) != 0) continue;
    ADD_FAILURE() << "new file " << name;
  }
  if (row.writesResult) {
    int shape[3] = {0, 0, 0};
    const std::vector<float> values = readResult(dir.file("result.nc"), nullptr, shape);
    EXPECT_EQ(shape[0], 12);
    EXPECT_EQ(values.size(), static_cast<std::size_t>(shape[0]) * shape[1] * shape[2]);
    EXPECT_FALSE(values.empty());
    if (row.emptyResult) {
      for (float v : values) ASSERT_EQ(v, -1e-30f);
    }
  }
}

TEST(BadInput, ParameterFiles) {
  for (const BadInput& row : parameterFileRows()) runRow(row);
}

TEST(BadInput, ObservationFiles) {
  for (const BadInput& row : observationRows()) runRow(row);
}

TEST(BadInput, BathymetryFiles) {
  for (const BadInput& row : bathymetryRows()) runRow(row);
}

TEST(BadInput, ResultFiles) {
  for (const BadInput& row : outputRows()) runRow(row);
}

}  // namespace
}  // namespace karnet::e2e
