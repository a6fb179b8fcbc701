#ifndef KARNET_TOOLS_MKGRID_ESRI_ASCII_H_
#define KARNET_TOOLS_MKGRID_ESRI_ASCII_H_

#include <cstdint>
#include <istream>
#include <string>
#include <vector>

namespace karnet::mkgrid {

// An ESRI ASCII grid as written: the header and the values, rows from north
// to south, west to east within a row.
struct EsriGrid {
  std::int32_t ncols = 0;
  std::int32_t nrows = 0;
  double xll = 0.0;           // xllcorner or xllcenter
  double yll = 0.0;           // yllcorner or yllcenter
  bool xIsCorner = true;      // xllcorner (edge of the cell) rather than xllcenter
  bool yIsCorner = true;
  double dx = 0.0;            // cellsize, or dx where the file gives dx and dy
  double dy = 0.0;
  bool hasNodata = false;
  double nodata = 0.0;
  std::vector<double> values;  // nrows * ncols

  bool isNodata(double value) const { return hasNodata && value == nodata; }
};

// Reads a grid; false and a message naming the line on any fault (missing or
// repeated header keyword, bad number, wrong number of values).
bool parseEsriAscii(std::istream& in, EsriGrid* grid, std::string* error);
bool readEsriAsciiFile(const std::string& path, EsriGrid* grid, std::string* error);

// A whole token as a finite number; false for anything else (trailing text, overflow).
bool parseNumber(const std::string& token, double* value);

}  // namespace karnet::mkgrid

#endif  // KARNET_TOOLS_MKGRID_ESRI_ASCII_H_
