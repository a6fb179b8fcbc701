// Where the grid lies: projection, spacing, extent and orientation.
#include "mkgrid/target_grid.h"

#include <strings.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <numbers>
#include <vector>

#include "mkgrid/grid_projection.h"

namespace karnet::mkgrid {
namespace {

constexpr double kDegree = std::numbers::pi / 180.0;
constexpr double kMaxNodes = 2147483647.0;  // grid sizes are counted in signed 32 bits
constexpr int kEdgeSteps = 32;              // points per side when outlining a region

struct Point {
  double x, y;
};

// The outline of a box, kEdgeSteps points per side.
std::vector<Point> boxOutline(double x0, double y0, double x1, double y1) {
  std::vector<Point> points;
  for (int k = 0; k < kEdgeSteps; ++k) {
    const double f = static_cast<double>(k) / kEdgeSteps;
    points.push_back({x0 + f * (x1 - x0), y0});
    points.push_back({x1, y0 + f * (y1 - y0)});
    points.push_back({x1 - f * (x1 - x0), y1});
    points.push_back({x0, y1 - f * (y1 - y0)});
  }
  return points;
}

// The source's outline (its cells' outer edges) in its own coordinates.
std::vector<Point> sourceOutline(const SourceRaster& source) {
  std::vector<Point> points;
  for (const Point& p : boxOutline(0.0, 0.0, source.width, source.height)) {
    Point q;
    source.position(p.x, p.y, &q.x, &q.y);
    points.push_back(q);
  }
  return points;
}

// Transforms points in place; those that cannot be transformed are dropped.
void transformPoints(OGRCoordinateTransformationH transform, std::vector<Point>* points) {
  std::vector<Point> kept;
  for (Point p : *points) {
    double z = 0.0;
    int ok = 0;
    if (OCTTransformEx(transform, 1, &p.x, &p.y, &z, &ok) && ok && std::isfinite(p.x) &&
        std::isfinite(p.y)) {
      kept.push_back(p);
    }
  }
  *points = std::move(kept);
}

// A length cut to three significant digits (a spacing easy to read, never
// coarser than the cells it comes from).
double roundedLength(double value) {
  if (!(value > 0.0) || !std::isfinite(value)) return value;
  const double unit = std::pow(10.0, std::floor(std::log10(value)) - 2.0);
  return std::floor(value / unit * (1.0 + 1e-12)) * unit;
}

// The region's frame bounds for a rotation: u along the grid's x axis, v along its y axis.
struct FrameBox {
  double uMin, uMax, vMin, vMax;
};

FrameBox frameBox(const std::vector<Point>& points, double rotation) {
  const double c = std::cos(rotation * kDegree), s = std::sin(rotation * kDegree);
  constexpr double kInf = std::numeric_limits<double>::infinity();
  FrameBox box{kInf, -kInf, kInf, -kInf};
  for (const Point& p : points) {
    const double u = p.x * c - p.y * s;
    const double v = p.x * s + p.y * c;
    box.uMin = std::min(box.uMin, u);
    box.uMax = std::max(box.uMax, u);
    box.vMin = std::min(box.vMin, v);
    box.vMax = std::max(box.vMax, v);
  }
  return box;
}

// Projected position of frame position (u, v).
Point fromFrame(double u, double v, double rotation) {
  const double c = std::cos(rotation * kDegree), s = std::sin(rotation * kDegree);
  return {u * c + v * s, -u * s + v * c};
}

bool nearWhole(double value) { return std::fabs(value - std::round(value)) < 1e-6; }

}  // namespace

void TargetGrid::geoTransform(double t[6]) const {
  const double c = std::cos(rotation * kDegree), s = std::sin(rotation * kDegree);
  // The north-west corner of the raster: half a cell west and south of the
  // origin node along the grid's axes, then ny - 1/2 cells up its y axis.
  t[0] = originX - 0.5 * dx * c + (ny - 0.5) * dy * s;
  t[3] = originY + 0.5 * dx * s + (ny - 0.5) * dy * c;
  t[1] = dx * c;
  t[2] = -dy * s;
  t[4] = -dx * s;
  t[5] = -dy * c;
}

bool planGrid(const SourceRaster& source, const MkgridOptions& options, TargetGrid* grid,
              std::string* notes, std::string* error) {
  const std::string& input = options.input;
  GridProjection chosen;
  if (!chooseProjection(source, options, &chosen, notes, error)) return false;
  const std::string& projection = chosen.text;
  const Cartography* map = chosen.map.get();
  OGRSpatialReferenceH crs = chosen.sourceCrs.get();
  OGRSpatialReferenceH target = chosen.targetCrs.get();
  const bool georeferenced = crs != nullptr;
  const bool reproject = chosen.reproject;
  const bool local = strcasecmp(projection.c_str(), "LOCAL") == 0;

  // Options that only make sense for one kind of source.
  const bool originGiven = options.origin != OriginSource::Grid;
  const bool resampleAsked = options.hasSpacing || options.extent != ExtentKind::Source;
  const char* originOption =
      options.origin == OriginSource::Geographic ? "--origin-geo" : "--origin-proj";
  if (originGiven && georeferenced) {
    *error = std::string(originOption) + ": " + input + " is georeferenced, so its origin " +
             "follows from it; the option places a source without CRS";
    return false;
  }
  if (originGiven && resampleAsked) {
    *error = std::string(originOption) + " places the source grid as it is; it cannot be " +
             "combined with --spacing, --extent or --extent-proj";
    return false;
  }
  if (!georeferenced && options.hasOrientation && resampleAsked) {
    *error = "--orientation: " + input + " names no CRS, so it is taken as the turned grid " +
             "itself and cannot be resampled with --spacing or --extent; give it a CRS with " +
             "--source-crs to resample it onto a turned grid";
    return false;
  }
  if (options.extent == ExtentKind::Geographic && local) {
    *error = "--extent is in degrees, which a LOCAL grid has not; use --extent-proj";
    return false;
  }

  // The source's outline and cell size in the grid's projection.
  std::vector<Point> outline = sourceOutline(source);
  const double* t = source.transform;
  double resX = std::hypot(t[1], t[4]);
  double resY = std::hypot(t[2], t[5]);
  if (reproject) {
    CoordinateTransform transform(OCTNewCoordinateTransformation(crs, target));
    if (!transform) {
      *error = input + ": no transformation from its CRS to " + projection + ": " +
               lastGdalError("PROJ has none");
      return false;
    }
    transformPoints(transform.get(), &outline);
    std::vector<Point> cell(3);
    source.position(source.width / 2.0, source.height / 2.0, &cell[0].x, &cell[0].y);
    source.position(source.width / 2.0 + 1.0, source.height / 2.0, &cell[1].x, &cell[1].y);
    source.position(source.width / 2.0, source.height / 2.0 + 1.0, &cell[2].x, &cell[2].y);
    transformPoints(transform.get(), &cell);
    if (cell.size() == 3) {
      resX = std::hypot(cell[1].x - cell[0].x, cell[1].y - cell[0].y);
      resY = std::hypot(cell[2].x - cell[0].x, cell[2].y - cell[0].y);
    }
  }
  if (outline.empty()) {
    *error = input + ": lies outside the domain of the projection " + projection;
    return false;
  }

  // Spacing, as the file will hold it (32-bit floats).
  double dx = options.dx, dy = options.dy;
  if (!options.hasSpacing) {
    if (reproject) {
      dx = dy = roundedLength(std::min(resX, resY));
      *notes += "  spacing " + numberText(dx) + " m (the source's cells are about " +
                numberText(resX) + " x " + numberText(resY) + " m here; --spacing sets it)\n";
    } else {
      dx = resX;
      dy = resY;
    }
  }
  dx = static_cast<float>(dx);
  dy = static_cast<float>(dy);
  if (!(dx > 0.0) || !(dy > 0.0) || !std::isfinite(dx) || !std::isfinite(dy)) {
    *error = input + ": its cell size does not give a usable spacing; give --spacing";
    return false;
  }

  // The region in the grid's projection.
  std::vector<Point> region;
  const double* b = options.box;
  if (options.extent == ExtentKind::Source) {
    region = outline;
  } else if (options.extent == ExtentKind::Projected) {
    region = boxOutline(b[0], b[1], b[2], b[3]);
  } else {
    for (const Point& p : boxOutline(b[0], b[1], b[2], b[3])) {
      Point q;
      map->geoToProj(p.x, p.y, &q.x, &q.y);
      if (std::isfinite(q.x) && std::isfinite(q.y)) region.push_back(q);
    }
    if (region.empty()) {
      *error = "--extent lies outside the domain of the projection " + projection;
      return false;
    }
  }

  // The frame: turned so that the grid's y axis points at the orientation
  // from true north at the origin node, which itself depends on the frame;
  // a few rounds settle both (the convergence changes slowly across a region).
  double rotation = 0.0;
  FrameBox box = frameBox(region, rotation);
  Point origin = fromFrame(box.uMin + dx / 2.0, box.vMin + dy / 2.0, rotation);
  if (georeferenced && options.hasOrientation) {
    for (int round = 0; round < 50; ++round) {
      double longitude = 0.0, latitude = 0.0;
      map->projToGeo(origin.x, origin.y, &longitude, &latitude);
      const double next = options.orientation - map->convergence(longitude, latitude);
      if (!std::isfinite(next)) {
        *error = "the origin node lies outside the domain of the projection " + projection;
        return false;
      }
      if (std::fabs(next - rotation) <= 1e-12) break;
      rotation = next;
      box = frameBox(region, rotation);
      origin = fromFrame(box.uMin + dx / 2.0, box.vMin + dy / 2.0, rotation);
    }
  }
  const double columns = (box.uMax - box.uMin) / dx;
  const double rows = (box.vMax - box.vMin) / dy;
  const double nx = std::max(1.0, std::ceil(columns - 1e-6));
  const double ny = std::max(1.0, std::ceil(rows - 1e-6));
  if (!(columns <= kMaxNodes) || !(rows <= kMaxNodes) || nx * ny > kMaxNodes) {
    const std::string spacing =
        options.hasSpacing ? "--spacing " + numberText(options.dx) + "," + numberText(options.dy)
                           : "the source's cell size";
    *error = spacing + " gives " + numberText(std::ceil(columns)) + " x " +
             numberText(std::ceil(rows)) + " nodes over the region, more than 2147483647";
    return false;
  }

  TargetGrid out;
  out.projection = projection;
  out.nx = static_cast<std::int32_t>(nx);
  out.ny = static_cast<std::int32_t>(ny);
  out.dx = dx;
  out.dy = dy;
  out.rotation = rotation;
  out.originX = origin.x;
  out.originY = origin.y;

  // Nodes on the source's cell centres are copied as they are.
  if (!reproject && rotation == 0.0 && source.northUp() && std::fabs(dx - t[1]) <= 1e-6 * dx &&
      std::fabs(dy + t[5]) <= 1e-6 * dy) {
    const double column = (origin.x - source.southWestX) / t[1];
    const double row = (origin.y - source.southWestY) / -t[5];
    if (nearWhole(column) && nearWhole(row)) {
      out.copyCells = true;
      out.firstColumn = static_cast<std::int64_t>(std::llround(column));
      out.firstRowUp = static_cast<std::int64_t>(std::llround(row));
      out.originX = source.southWestX + static_cast<double>(out.firstColumn) * t[1];
      out.originY = source.southWestY - static_cast<double>(out.firstRowUp) * t[5];
    }
  }
  if (options.resampling != Resampling::Automatic) {
    out.method = options.resampling;
  } else {
    const bool coarser = dx > resX * (1.0 + 1e-6) || dy > resY * (1.0 + 1e-6);
    out.method = coarser ? Resampling::Average : Resampling::Bilinear;
  }
  if (reproject) {
    out.sourceWkt = wktOf(crs);
    out.targetWkt = wktOf(target);
  }

  // The origin node on the earth, and the orientation.
  if (options.origin == OriginSource::Geographic) {
    out.longitude = options.originA;
    out.latitude = options.originB;
  } else if (options.origin == OriginSource::Projected) {
    map->projToGeo(options.originA, options.originB, &out.longitude, &out.latitude);
  } else {
    map->projToGeo(out.originX, out.originY, &out.longitude, &out.latitude);
  }
  if (!std::isfinite(out.longitude) || !std::isfinite(out.latitude)) {
    *error = "the origin node lies outside the domain of the projection " + projection;
    return false;
  }
  out.orientation =
      options.hasOrientation ? options.orientation : map->convergence(out.longitude, out.latitude);
  if (!std::isfinite(out.orientation)) {
    *error = "the orientation is not a finite number";
    return false;
  }
  *grid = std::move(out);
  return true;
}

}  // namespace karnet::mkgrid
