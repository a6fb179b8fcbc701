#ifndef KARNET_OUTPUT_RESULT_COORDINATES_H_
#define KARNET_OUTPUT_RESULT_COORDINATES_H_

#include <string>

#include "gridfile/grid_file.h"

namespace karnet {

struct FileDescription;

// The largest difference, in degrees, between the orientation and the
// meridian convergence at the origin for which the grid counts as parallel to
// the projection's axes; the bathymetry's custom block holds the orientation
// in single precision, so one float rounding of it is allowed on top.
inline constexpr double kParallelGridTolerance = 1e-6;

// Where a result grid lies: its origin node in projected coordinates and the
// turn between the grid frame and the projection's frame, the same as data
// scanning uses (theta = (orientation - convergence) * -pi / 180).
struct ResultFrame {
  bool local = false;   // LOCAL: plain metres, no place on the earth
  bool turned = false;  // the grid's axes are not parallel to the projection's
  double xOrigin = 0.0;
  double yOrigin = 0.0;
  double co = 1.0;  // cos theta (1 when not turned)
  double si = 0.0;  // sin theta (0 when not turned)

  // Projected position of the node i along x, j along y: the grid frame
  // turned back into the projection's frame.
  void nodePosition(double dx, double dy, double i, double j, double* x, double* y) const {
    const double xt = i * dx;
    const double yt = j * dy;
    *x = xOrigin + xt * co - yt * si;
    *y = yOrigin + xt * si + yt * co;
  }
};

// The depth axis, x and y, and the nodes' longitudes and latitudes of the
// result grid that description describes, in projection. false when the
// projection cannot be used.
bool resultGeoreference(const FileDescription& description, const std::string& projection,
                        GrdGeoreference* georeference, ResultFrame* frame = nullptr);

}  // namespace karnet

#endif  // KARNET_OUTPUT_RESULT_COORDINATES_H_
