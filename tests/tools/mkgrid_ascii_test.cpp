// karnet-mkgrid on ESRI ASCII grids: the strict reader and the grids made from them as they are.
#include <cpl_conv.h>
#include <gtest/gtest.h>
#include <ogr_srs_api.h>

#include <sstream>
#include <string>
#include <utility>
#include <vector>

#include "input/bathymetry_read.h"
#include "input/cartography.h"
#include "mkgrid/esri_ascii.h"
#include "support/file_description.h"
#include "support/float_grid.h"
#include "tools/mkgrid_test_support.h"

namespace karnet {
namespace {

using mkgrid::EsriGrid;
using test::quoted;
using test::runMkgrid;

// Four columns, three rows, the north row first; one NODATA cell.
constexpr const char* kSmallGrid =
    "ncols 4\nnrows 3\nxllcorner 1000\nyllcorner 2000\ncellsize 50\nNODATA_value -9999\n"
    "-1 -2 -3 -9999\n-4 -5 -6 -7\n-8 -9 -10 -11\n";

bool parse(const std::string& text, EsriGrid* grid, std::string* error) {
  std::istringstream in(text);
  return mkgrid::parseEsriAscii(in, grid, error);
}

// Centre references, separate dx/dy, any keyword case, values spread over
// lines as they come, CR LF line ends, no NODATA. (Corner references, cellsize
// and NODATA are in the grid that the builder and the program read below.)
TEST(MkgridAscii, HeaderVariants) {
  EsriGrid grid;
  std::string error;
  ASSERT_TRUE(
      parse("NCOLS 2\r\nNROWS 2\r\nXLLCENTER -5.5\r\nyllcenter 7\r\nDX 10\r\ndy 20\r\n"
            "1 2 3\r\n4\r\n",
            &grid, &error))
      << error;
  EXPECT_FALSE(grid.xIsCorner || grid.yIsCorner || grid.hasNodata);
  EXPECT_EQ(std::vector<double>({grid.xll, grid.yll, grid.dx, grid.dy}),
            std::vector<double>({-5.5, 7, 10, 20}));
  EXPECT_EQ(grid.values, (std::vector<double>{1, 2, 3, 4}));
}

TEST(MkgridAscii, FaultsAreNamed) {
  const std::string head = "ncols 2\nnrows 2\nxllcorner 0\nyllcorner 0\ncellsize 1\n";
  const std::pair<std::string, const char*> cases[] = {
      // text, part of the message
      {head + "1 2 3\n", "expected 4 values"},
      {head + "1 2 3 4 5\n", "line 6: more values"},
      {head + "1 2 x 4\n", "line 6: bad grid value 'x'"},
      {head + "1 2 nan 4\n", "bad grid value 'nan'"},
      {"ncols 2\nnrows 2\nxllcorner 0\ncellsize 1\n1 2 3 4\n", "lacks yllcorner or yllcenter"},
      {"ncols 2\nncols 2\n", "line 2: repeated header keyword 'ncols'"},
      {"ncols 0\n", "ncols must be a whole number"},
      {"ncols 2\nnrows 2\nxllcorner 0\nyllcorner 0\ncellsize -1\n", "cellsize must be positive"},
      {"ncols 2\nnrows 2\nxllcorner 0\nyllcorner 0\ncellsize 1\ndx 1\n", "both cellsize"},
      {"ncols 2\nbogus 3\n", "line 2: unknown header keyword 'bogus'"},
      {"ncols 65536\nnrows 65536\nxllcorner 0\nyllcorner 0\ncellsize 1\n1\n", "exceeds"},
  };
  for (const auto& [text, expected] : cases) {
    EsriGrid grid;
    std::string error;
    EXPECT_FALSE(parse(text, &grid, &error)) << text;
    EXPECT_NE(error.find(expected), std::string::npos) << text << "\nmessage: " << error;
  }
}

class MkgridProgram : public test::ScratchTest {};

TEST_F(MkgridProgram, MakesAFileTheBathymetryReaderTakes) {
  test::writeBytes(file("in.asc"), kSmallGrid);
  int code = -1;
  const std::string files = "'" + file("in.asc") + "' '" + path + "'";
  const std::string output = runMkgrid("--projection LOCAL --land-value=0.5 -o 12 " + files, &code);
  ASSERT_EQ(code, 0) << output;
  FileDescription* d = descriptionNew(2);
  FloatGrid2D grid;
  ASSERT_EQ(bathymetryRead(path.c_str(), *d, 1, grid), 1);
  EXPECT_EQ(std::vector<double>({double(d->axes[1].lastIndex), double(d->axes[2].lastIndex),
                                 d->axes[1].spacing, d->axes[1].origin, d->axes[2].origin}),
            std::vector<double>({3, 2, 50, 1025, 2025}));
  EXPECT_EQ(std::vector<double>({d->misc[0], d->misc[2], d->misc[3]}),
            std::vector<double>({12, -900, 0.5}));
  EXPECT_EQ(d->items[1].values[1], -11.0f);  // minimum and maximum, land included
  EXPECT_EQ(d->items[1].values[2], 0.5f);
  EXPECT_EQ(grid.at(0, 0), -8.0f);
  EXPECT_EQ(grid.at(3, 2), 0.5f);
  grid2DFree(grid);
  descriptionFree(d);
}

// Negated values keep the land value as it is; a given orientation and
// projected origin are stored as given (LOCAL: the origin is plain metres).
TEST_F(MkgridProgram, NegatedValuesOrientationAndGivenOrigin) {
  test::writeBytes(file("in.asc"), kSmallGrid);
  int code = -1;
  const std::string output = runMkgrid("--land-value 2.5 --negate -o 30 --origin-proj 7,8 " +
                                           quoted(file("in.asc")) + " " + quoted(path),
                                       &code);
  ASSERT_EQ(code, 0) << output;
  const test::MadeGrid b = test::readMadeGrid(path);
  EXPECT_EQ(b.values, (std::vector<float>{8, 9, 10, 11, 4, 5, 6, 7, 1, 2, 3, 2.5f}));
  EXPECT_EQ(std::vector<double>({b.longitude, b.latitude, b.orientation, b.landValue}),
            std::vector<double>({7, 8, 30, 2.5}));
}

TEST_F(MkgridProgram, ProjectedOriginGoesThroughTheProjection) {
  test::writeBytes(file("in.asc"),
                   "ncols 1\nnrows 1\nxllcenter 600000\nyllcenter 6200000\ncellsize 100\n-3\n");
  int code = -1;
  std::string output = runMkgrid("-p UTM-32 " + quoted(file("in.asc")) + " " + quoted(path), &code);
  ASSERT_EQ(code, 0) << output;
  const test::MadeGrid b = test::readMadeGrid(path);
  Cartography map("UTM-32", 0, 0, 0);
  double x = 0, y = 0;
  map.geoToProj(b.longitude, b.latitude, &x, &y);
  EXPECT_NEAR(x, 600000.0, 1e-4);
  EXPECT_NEAR(y, 6200000.0, 1e-4);
  // East of the central meridian: the grid's columns run along grid north,
  // which lies clockwise of true north.
  EXPECT_GT(b.orientation, 0.0);
  EXPECT_NEAR(b.orientation, map.convergence(b.longitude, b.latitude), 1e-12);

  output = runMkgrid("-p NOT-A-PROJECTION " + quoted(file("in.asc")) + " " + quoted(file("x.nc")),
                     &code);
  EXPECT_EQ(code, 1);
  EXPECT_NE(output.find("--projection 'NOT-A-PROJECTION' is unusable"), std::string::npos)
      << output;
}

// A .prj file beside the grid gives it a CRS: the grid's projection by
// default, and then the origin follows from it alone.
TEST_F(MkgridProgram, ProjectionFileBesideTheGridIsItsCrs) {
  test::writeBytes(file("in.asc"),
                   "ncols 2\nnrows 1\nxllcorner 600000\nyllcorner 6200000\ncellsize 100\n-3 -4\n");
  OGRSpatialReferenceH srs = OSRNewSpatialReference(nullptr);
  OSRImportFromEPSG(srs, 32633);
  OSRMorphToESRI(srs);
  char* wkt = nullptr;
  OSRExportToWkt(srs, &wkt);
  test::writeBytes(file("in.prj"), wkt);
  CPLFree(wkt);
  OSRRelease(srs);
  int code = -1;
  std::string output = runMkgrid(quoted(file("in.asc")) + " " + quoted(path), &code);
  ASSERT_EQ(code, 0) << output;
  const test::MadeGrid b = test::readMadeGrid(path);
  EXPECT_EQ(b.projection, "UTM-33");
  EXPECT_EQ(b.values, (std::vector<float>{-3, -4}));
  test::NodePlacer nodes(b);
  EXPECT_NEAR(nodes.x0, 600050.0, 1e-4);
  EXPECT_NEAR(nodes.y0, 6200050.0, 1e-4);

  output =
      runMkgrid("--origin-geo 9,55 " + quoted(file("in.asc")) + " " + quoted(file("x.nc")), &code);
  EXPECT_EQ(code, 1);
  EXPECT_NE(output.find("is georeferenced"), std::string::npos) << output;
}

TEST_F(MkgridProgram, BadInputEndsWithCodeOneAndAMessage) {
  test::writeBytes(file("in.asc"), kSmallGrid);
  test::writeBytes(file("bad.asc"), "ncols 2\nnrows 1\nxllcorner 0\nyllcorner 0\n");
  test::writeBytes(file("out.nc"), "earlier");
  const std::string in = "'" + file("in.asc") + "' ";
  const std::string out = "'" + file("out.nc") + "'";
  const std::pair<std::string, const char*> cases[] = {
      // arguments, part of the message
      {"", "Usage: karnet-mkgrid [options] INPUT OUTPUT.nc"},
      {"--frobnicate " + in + out, "unknown option '--frobnicate'"},
      {"--land-value abc " + in + out, "bad land value 'abc'"},
      {"--origin-geo 10 " + in + out, "needs two numbers"},
      {"'" + file("bad.asc") + "' " + out, "lacks cellsize"},
      {"'" + file("none.asc") + "' " + out, "cannot open"},
      {in + "'" + file("no/dir/out.nc") + "'", "cannot create"},
  };
  int code = -1;
  for (const auto& [arguments, expected] : cases) {
    const std::string output = runMkgrid(arguments, &code);
    EXPECT_EQ(code, 1) << arguments;
    EXPECT_NE(output.find(expected), std::string::npos) << output;
  }
  EXPECT_EQ(test::readBytes(file("out.nc")), "earlier");
}

}  // namespace
}  // namespace karnet
