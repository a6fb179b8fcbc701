// The command line of karnet-mkgrid.
#include "mkgrid/options.h"

#include <strings.h>

#include <cmath>
#include <vector>

#include "common/tool_argument.h"
#include "mkgrid/esri_ascii.h"

#ifndef KARNET_VERSION
#define KARNET_VERSION "unknown"
#endif

namespace karnet::mkgrid {
namespace {

constexpr const char* kUsage = "Usage: karnet-mkgrid [options] INPUT OUTPUT.nc\n";

constexpr const char* kHelp =
    "Makes a bathymetry file for karnet from any raster GDAL reads (GeoTIFF, NetCDF such as\n"
    "GEBCO or ETOPO in longitude/latitude, ESRI ASCII .asc, ...). Heights in metres, negative\n"
    "below sea level. The origin node is the centre of the south-west cell; NODATA cells and\n"
    "cells outside the source become the land value.\n"
    "\n"
    "Grid:\n"
    "  -p, --projection TEXT  LOCAL (plain metres), UTM-<zone>[N|S], EPSG:<code>, a PROJ\n"
    "                         string or WKT of a projected CRS, or auto (the UTM zone of the\n"
    "                         region's centre). Default: the source's projected CRS; LOCAL\n"
    "                         for a source without CRS. A source in degrees needs one.\n"
    "      --spacing DX[,DY]  node spacing in metres; default: the source's cell size (in\n"
    "                         another projection: its smaller side, to 3 digits)\n"
    "      --extent LON0,LAT0,LON1,LAT1   the region to cover, in degrees\n"
    "      --extent-proj X0,Y0,X1,Y1      the region to cover, in the grid's projection (m)\n"
    "                         default: all of the source\n"
    "  -o, --orientation DEG  degrees clockwise from true north to the grid's y axis;\n"
    "                         default: the meridian convergence at the origin, so that the\n"
    "                         grid's columns run along the map's grid north. A georeferenced\n"
    "                         source is resampled onto the turned grid; a source without CRS\n"
    "                         is taken as the turned grid itself.\n"
    "      --resampling M     bilinear, average, nearest or cubic; default: average when the\n"
    "                         spacing is coarser than the source's cells, else bilinear\n"
    "\n"
    "Source:\n"
    "      --variable NAME    the variable of a NetCDF file; default: its only 2-D variable\n"
    "      --source-crs TEXT  the source's CRS when the file has none or a wrong one\n"
    "                         (EPSG:4326, UTM-32, WKT, ...)\n"
    "      --origin-geo LON,LAT   for a source without CRS, as it is: geographic position\n"
    "      --origin-proj X,Y      or projected position of the origin node\n"
    "\n"
    "Values:\n"
    "  -l, --land-value V     land value; values at or above it are land (default 0)\n"
    "      --negate           store -value (for grids of positive depths)\n"
    "  -t, --title TEXT       title of the file\n"
    "  -h, --help             this text\n"
    "      --version          the program's version\n";

bool parseList(const std::string& text, std::size_t count, double* values) {
  std::size_t start = 0;
  for (std::size_t n = 0; n < count; ++n) {
    const std::size_t comma = n + 1 < count ? text.find(',', start) : std::string::npos;
    if (n + 1 < count && comma == std::string::npos) return false;
    if (!parseNumber(
            text.substr(start, comma == std::string::npos ? std::string::npos : comma - start),
            &values[n])) {
      return false;
    }
    start = comma + 1;
  }
  return true;
}

ParseResult fail(std::string* message, const std::string& text) {
  *message = text;
  return ParseResult::Error;
}

}  // namespace

const char* usageText() { return kUsage; }
const char* helpText() { return kHelp; }

ParseResult parseCommandLine(int argc, const char* const* argv, MkgridOptions* options,
                             std::string* message) {
  std::vector<std::string> files;
  bool originGiven = false;
  bool extentGiven = false;
  for (int i = 1; i < argc; ++i) {
    const ToolArgument argument = splitToolArgument(argv[i]);
    const std::string& arg = argument.name;
    const bool hasValue = argument.attached;
    auto needValue = [&](std::string* out) {
      return toolOptionValue(argument, argc, argv, i, out);
    };
    std::string text;
    auto takeValue = [&]() {
      if (needValue(&text)) return true;
      *message = arg + " needs a value";
      return false;
    };
    if (arg == "-h" || arg == "--help") {
      *message = std::string(kUsage) + kHelp;
      return ParseResult::Answered;
    }
    if (arg == "--version" && !hasValue) {
      *message = std::string("karnet-mkgrid ") + KARNET_VERSION + "\n";
      return ParseResult::Answered;
    }
    if (arg == "-p" || arg == "--projection") {
      if (!takeValue()) return ParseResult::Error;
      options->projection = text;
      if (text.find_first_not_of(" \t") == std::string::npos) {
        return fail(message, arg + " needs a projection text");
      }
    } else if (arg == "--source-crs") {
      if (!takeValue()) return ParseResult::Error;
      options->sourceCrs = text;
    } else if (arg == "--variable") {
      if (!takeValue()) return ParseResult::Error;
      if (text.empty()) return fail(message, "--variable needs a name");
      options->variable = text;
    } else if (arg == "--origin-geo" || arg == "--origin-proj") {
      if (!takeValue()) return ParseResult::Error;
      if (originGiven) return fail(message, "give the origin only once");
      double pair[2];
      if (!parseList(text, 2, pair)) {
        return fail(message, arg + " needs two numbers A,B, not '" + text + "'");
      }
      options->originA = pair[0];
      options->originB = pair[1];
      options->origin = arg == "--origin-geo" ? OriginSource::Geographic : OriginSource::Projected;
      originGiven = true;
    } else if (arg == "-o" || arg == "--orientation") {
      if (!takeValue()) return ParseResult::Error;
      if (!parseNumber(text, &options->orientation)) {
        return fail(message, "bad orientation '" + text + "'");
      }
      options->hasOrientation = true;
    } else if (arg == "--spacing") {
      if (!takeValue()) return ParseResult::Error;
      double pair[2];
      if (parseList(text, 2, pair)) {
        options->dx = pair[0];
        options->dy = pair[1];
      } else if (parseNumber(text, &pair[0])) {
        options->dx = options->dy = pair[0];
      } else {
        return fail(message, "--spacing needs DX or DX,DY in metres, not '" + text + "'");
      }
      if (!(options->dx > 0.0) || !(options->dy > 0.0) || options->dx > 1e7 || options->dy > 1e7 ||
          static_cast<float>(options->dx) < 1e-6f || static_cast<float>(options->dy) < 1e-6f) {
        return fail(message, "--spacing must be between 1e-6 and 1e7 metres, not '" + text + "'");
      }
      options->hasSpacing = true;
    } else if (arg == "--extent" || arg == "--extent-proj") {
      if (!takeValue()) return ParseResult::Error;
      if (extentGiven) return fail(message, "give --extent or --extent-proj only once");
      const bool geographic = arg == "--extent";
      double* b = options->box;
      if (!parseList(text, 4, b)) {
        return fail(message, arg + " needs four numbers " +
                                 (geographic ? "LON0,LAT0,LON1,LAT1" : "X0,Y0,X1,Y1") + ", not '" +
                                 text + "'");
      }
      if (!(b[0] < b[2]) || !(b[1] < b[3])) {
        return fail(message, arg + " '" + text + "' is empty: the first corner must lie " +
                                 "south-west of the second");
      }
      if (geographic && (b[1] < -90.0 || b[3] > 90.0 || b[2] - b[0] > 360.0)) {
        return fail(message, "--extent '" + text +
                                 "': latitudes lie within -90..90 and the box spans at most "
                                 "360 degrees of longitude");
      }
      options->extent = geographic ? ExtentKind::Geographic : ExtentKind::Projected;
      extentGiven = true;
    } else if (arg == "--resampling") {
      if (!takeValue()) return ParseResult::Error;
      const char* t = text.c_str();
      if (strcasecmp(t, "bilinear") == 0) {
        options->resampling = Resampling::Bilinear;
      } else if (strcasecmp(t, "average") == 0) {
        options->resampling = Resampling::Average;
      } else if (strcasecmp(t, "nearest") == 0) {
        options->resampling = Resampling::Nearest;
      } else if (strcasecmp(t, "cubic") == 0) {
        options->resampling = Resampling::Cubic;
      } else {
        return fail(message,
                    "--resampling is bilinear, average, nearest or cubic, not '" + text + "'");
      }
    } else if (arg == "-l" || arg == "--land-value") {
      if (!takeValue()) return ParseResult::Error;
      if (!parseNumber(text, &options->landValue)) {
        return fail(message, "bad land value '" + text + "'");
      }
    } else if (arg == "--negate" && !hasValue) {
      options->negate = true;
    } else if (arg == "-t" || arg == "--title") {
      if (!takeValue()) return ParseResult::Error;
      options->title = text;
    } else if (arg == "--" && !hasValue) {
      for (++i; i < argc; ++i) files.push_back(argv[i]);
    } else if (arg.size() > 1 && arg[0] == '-') {
      return fail(message, "unknown option '" + arg + "'");
    } else {
      files.push_back(arg);
    }
  }
  if (files.size() != 2) return fail(message, "give one input raster and one output file");
  options->input = files[0];
  options->output = files[1];
  return ParseResult::Run;
}

}  // namespace karnet::mkgrid
