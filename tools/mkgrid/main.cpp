// karnet-mkgrid: makes a bathymetry file for karnet from an ESRI ASCII grid.
#include <cerrno>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "mkgrid/esri_ascii.h"
#include "mkgrid/grid_builder.h"

namespace {

using karnet::mkgrid::BuildOptions;
using karnet::mkgrid::OriginSource;

constexpr const char* kUsage =
    "Usage: karnet-mkgrid [options] INPUT.asc OUTPUT.nc\n";

constexpr const char* kHelp =
    "Makes a bathymetry file for karnet from an ESRI ASCII grid (rows north to south).\n"
    "The origin node is the centre of the south-west cell; NODATA cells become the land value.\n"
    "\n"
    "Options:\n"
    "  -p, --projection TEXT  LOCAL (default; plain metres), UTM-<zone>[N|S], EPSG:<code>,\n"
    "                         a PROJ string or WKT of a projected CRS\n"
    "      --origin-geo LON,LAT   geographic position of the origin node (degrees)\n"
    "      --origin-proj X,Y      projected position of the origin node (converted\n"
    "                             through the projection); default: from the .asc header\n"
    "  -o, --orientation DEG  degrees clockwise from true north to the grid's y axis;\n"
    "                         default: the meridian convergence at the origin, so that\n"
    "                         the grid's columns run along the map's grid north\n"
    "  -l, --land-value V     land value; values below it are water (default 0)\n"
    "      --negate           store -value (for grids of positive depths)\n"
    "  -t, --title TEXT       title of the file\n"
    "  -h, --help             this text\n";

int usageError(const std::string& message) {
  std::fprintf(stderr, "karnet-mkgrid: %s\n%s", message.c_str(), kUsage);
  return 1;
}


using karnet::mkgrid::parseNumber;

bool parsePair(const std::string& text, double* a, double* b) {
  const std::size_t comma = text.find(',');
  if (comma == std::string::npos) return false;
  return parseNumber(text.substr(0, comma), a) && parseNumber(text.substr(comma + 1), b);
}

}  // namespace

int main(int argc, char** argv) {
  BuildOptions options;
  std::vector<std::string> files;
  bool originGiven = false;
  for (int i = 1; i < argc; ++i) {
    std::string arg = argv[i];
    std::string value;
    bool hasValue = false;
    if (arg.size() > 2 && arg.compare(0, 2, "--") == 0) {
      const std::size_t eq = arg.find('=');
      if (eq != std::string::npos) {
        value = arg.substr(eq + 1);
        arg = arg.substr(0, eq);
        hasValue = true;
      }
    }
    auto needValue = [&](std::string* out) {
      if (hasValue) {
        *out = value;
        return true;
      }
      if (i + 1 >= argc) return false;
      *out = argv[++i];
      return true;
    };
    if (arg == "-h" || arg == "--help") {
      std::printf("%s%s", kUsage, kHelp);
      return 0;
    }
    if (arg == "-p" || arg == "--projection") {
      if (!needValue(&options.projection)) return usageError(arg + " needs a value");
    } else if (arg == "--origin-geo" || arg == "--origin-proj") {
      std::string text;
      if (!needValue(&text)) return usageError(arg + " needs a value");
      if (originGiven) return usageError("give the origin only once");
      if (!parsePair(text, &options.originA, &options.originB)) {
        return usageError(arg + " needs two numbers A,B, not '" + text + "'");
      }
      options.origin =
          arg == "--origin-geo" ? OriginSource::Geographic : OriginSource::Projected;
      originGiven = true;
    } else if (arg == "-o" || arg == "--orientation") {
      std::string text;
      if (!needValue(&text)) return usageError(arg + " needs a value");
      if (!parseNumber(text, &options.orientation)) {
        return usageError("bad orientation '" + text + "'");
      }
      options.hasOrientation = true;
    } else if (arg == "-l" || arg == "--land-value") {
      std::string text;
      if (!needValue(&text)) return usageError(arg + " needs a value");
      if (!parseNumber(text, &options.landValue)) {
        return usageError("bad land value '" + text + "'");
      }
    } else if (arg == "--negate" && !hasValue) {
      options.negate = true;
    } else if (arg == "-t" || arg == "--title") {
      if (!needValue(&options.title)) return usageError(arg + " needs a value");
    } else if (arg == "--" && !hasValue) {
      for (++i; i < argc; ++i) files.push_back(argv[i]);
    } else if (arg.size() > 1 && arg[0] == '-') {
      return usageError("unknown option '" + arg + "'");
    } else {
      files.push_back(arg);
    }
  }
  if (files.size() != 2) return usageError("give one input grid and one output file");

  karnet::mkgrid::EsriGrid grid;
  std::string error;
  if (!karnet::mkgrid::readEsriAsciiFile(files[0], &grid, &error)) {
    std::fprintf(stderr, "karnet-mkgrid: %s\n", error.c_str());
    return 1;
  }
  karnet::mkgrid::Bathymetry bathymetry;
  if (!karnet::mkgrid::buildBathymetry(grid, options, &bathymetry, &error) ||
      !karnet::mkgrid::writeBathymetry(files[1], bathymetry, &error)) {
    std::fprintf(stderr, "karnet-mkgrid: %s\n", error.c_str());
    return 1;
  }
  std::printf("%s: %d x %d nodes, spacing %g x %g m, origin %.8g, %.8g, orientation %.6g deg\n",
              files[1].c_str(), bathymetry.nx, bathymetry.ny, bathymetry.dx, bathymetry.dy,
              bathymetry.longitude, bathymetry.latitude, bathymetry.orientation);
  return 0;
}
