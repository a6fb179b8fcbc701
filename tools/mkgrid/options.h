#ifndef KARNET_TOOLS_MKGRID_OPTIONS_H_
#define KARNET_TOOLS_MKGRID_OPTIONS_H_

#include <string>

namespace karnet::mkgrid {

enum class OriginSource {
  Grid,        // from the source's georeferencing
  Geographic,  // originA, originB are longitude and latitude in degrees
  Projected,   // originA, originB are projected x and y
};

enum class ExtentKind {
  Source,      // the whole source
  Geographic,  // box holds lon0, lat0, lon1, lat1 (degrees)
  Projected,   // box holds x0, y0, x1, y1 in the grid's projection (metres)
};

enum class Resampling { Automatic, Bilinear, Average, Nearest, Cubic };

// Everything the command line says.
struct MkgridOptions {
  std::string projection;  // empty: the source's own, else LOCAL; "auto": UTM zone
  std::string sourceCrs;   // replaces the source's CRS (or gives it one)
  std::string variable;    // the source variable; empty: the only 2-D one
  OriginSource origin = OriginSource::Grid;
  double originA = 0.0;
  double originB = 0.0;
  bool hasOrientation = false;  // else the meridian convergence at the origin
  double orientation = 0.0;
  bool hasSpacing = false;  // else the source's cell size
  double dx = 0.0;
  double dy = 0.0;
  ExtentKind extent = ExtentKind::Source;
  double box[4] = {0, 0, 0, 0};
  Resampling resampling = Resampling::Automatic;
  double landValue = 0.0;  // NODATA cells and cells outside the source become this
  bool negate = false;     // store -value (grids of positive depths)
  std::string title;
  std::string input;
  std::string output;
};

enum class ParseResult { Run, Answered, Error };

// Reads argv. Answered: --help or --version was printed (text in *message);
// Error: *message says what is wrong with the command line.
ParseResult parseCommandLine(int argc, const char* const* argv, MkgridOptions* options,
                             std::string* message);

const char* usageText();
const char* helpText();

}  // namespace karnet::mkgrid

#endif  // KARNET_TOOLS_MKGRID_OPTIONS_H_
