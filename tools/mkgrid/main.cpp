// karnet-mkgrid: makes a bathymetry file for karnet from a raster.
#include <cstdio>
#include <string>

#include "mkgrid/grid_builder.h"
#include "mkgrid/options.h"

int main(int argc, char** argv) {
  using namespace karnet::mkgrid;
  MkgridOptions options;
  std::string message;
  switch (parseCommandLine(argc, argv, &options, &message)) {
    case ParseResult::Answered:
      std::fputs(message.c_str(), stdout);
      return 0;
    case ParseResult::Error:
      std::fprintf(stderr, "karnet-mkgrid: %s\n%s", message.c_str(), usageText());
      return 1;
    case ParseResult::Run:
      break;
  }
  Bathymetry bathymetry;
  std::string summary;
  if (!makeBathymetry(options, &bathymetry, &summary, &message) ||
      !writeBathymetry(options.output, bathymetry, &message)) {
    std::fprintf(stderr, "karnet-mkgrid: %s\n", message.c_str());
    return 1;
  }
  std::printf(
      "%s: %d x %d nodes, spacing %g x %g m, %s, origin %.8g, %.8g, orientation %.6g deg\n%s",
      options.output.c_str(), bathymetry.nx, bathymetry.ny, bathymetry.dx, bathymetry.dy,
      bathymetry.projection.size() > 40 ? "projection from the source's WKT"
                                        : bathymetry.projection.c_str(),
      bathymetry.longitude, bathymetry.latitude, bathymetry.orientation, summary.c_str());
  return 0;
}
