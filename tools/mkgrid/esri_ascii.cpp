// Reading ESRI ASCII grids (.asc).
#include "mkgrid/esri_ascii.h"

#include <strings.h>

#include <cerrno>
#include <cfloat>
#include <cmath>
#include <cstdlib>
#include <fstream>
#include <sstream>

namespace karnet::mkgrid {
namespace {

// Most values of one grid: the engine counts grid elements in signed 32 bits.
constexpr std::int64_t kMaxValues = 2147483647;


bool parseCount(const std::string& token, std::int32_t* value) {
  if (token.empty() || token.size() > 10) return false;
  std::int64_t v = 0;
  for (char c : token) {
    if (c < '0' || c > '9') return false;
    v = v * 10 + (c - '0');
  }
  if (v < 1 || v > kMaxValues) return false;
  *value = static_cast<std::int32_t>(v);
  return true;
}

bool startsHeaderKeyword(const std::string& token) {
  const char c = token.empty() ? '\0' : token[0];
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
}

std::string at(long line) { return "line " + std::to_string(line) + ": "; }

struct HeaderState {
  bool ncols = false, nrows = false, x = false, y = false, cellsize = false, dx = false,
       dy = false, nodata = false;
};

// One "keyword value" header line.
bool headerLine(const std::string& key, const std::string& value, long line, EsriGrid* grid,
                HeaderState* seen, std::string* error) {
  auto once = [&](bool* flag) {
    if (*flag) {
      *error = at(line) + "repeated header keyword '" + key + "'";
      return false;
    }
    *flag = true;
    return true;
  };
  auto number = [&](double* target) {
    if (parseNumber(value, target)) return true;
    *error = at(line) + "bad value '" + value + "' for " + key;
    return false;
  };
  const char* k = key.c_str();
  if (strcasecmp(k, "ncols") == 0 || strcasecmp(k, "nrows") == 0) {
    const bool cols = strcasecmp(k, "ncols") == 0;
    if (!once(cols ? &seen->ncols : &seen->nrows)) return false;
    if (!parseCount(value, cols ? &grid->ncols : &grid->nrows)) {
      *error = at(line) + key + " must be a whole number from 1 to 2147483647, not '" + value +
               "'";
      return false;
    }
    return true;
  }
  if (strcasecmp(k, "xllcorner") == 0 || strcasecmp(k, "xllcenter") == 0) {
    if (!once(&seen->x)) return false;
    grid->xIsCorner = strcasecmp(k, "xllcorner") == 0;
    return number(&grid->xll);
  }
  if (strcasecmp(k, "yllcorner") == 0 || strcasecmp(k, "yllcenter") == 0) {
    if (!once(&seen->y)) return false;
    grid->yIsCorner = strcasecmp(k, "yllcorner") == 0;
    return number(&grid->yll);
  }
  if (strcasecmp(k, "cellsize") == 0 || strcasecmp(k, "dx") == 0 || strcasecmp(k, "dy") == 0) {
    const bool isDy = strcasecmp(k, "dy") == 0;
    const bool isDx = strcasecmp(k, "dx") == 0;
    if (!once(isDx ? &seen->dx : isDy ? &seen->dy : &seen->cellsize)) return false;
    double size = 0.0;
    if (!number(&size)) return false;
    if (size <= 0.0) {
      *error = at(line) + key + " must be positive";
      return false;
    }
    if (!isDy) grid->dx = size;
    if (!isDx) grid->dy = size;
    return true;
  }
  if (strcasecmp(k, "nodata_value") == 0) {
    if (!once(&seen->nodata)) return false;
    grid->hasNodata = true;
    return number(&grid->nodata);
  }
  *error = at(line) + "unknown header keyword '" + key + "'";
  return false;
}

bool checkHeader(const HeaderState& seen, std::string* error) {
  const char* missing = !seen.ncols                        ? "ncols"
                        : !seen.nrows                      ? "nrows"
                        : !seen.x                          ? "xllcorner or xllcenter"
                        : !seen.y                          ? "yllcorner or yllcenter"
                        : !seen.cellsize && !seen.dx       ? "cellsize"
                        : !seen.cellsize && !seen.dy       ? "dy"
                                                           : nullptr;
  if (missing != nullptr) {
    *error = std::string("header lacks ") + missing;
    return false;
  }
  if (seen.cellsize && (seen.dx || seen.dy)) {
    *error = "header gives both cellsize and dx/dy";
    return false;
  }
  return true;
}

}  // namespace

bool parseEsriAscii(std::istream& in, EsriGrid* grid, std::string* error) {
  std::string ignored;
  if (error == nullptr) error = &ignored;
  *grid = EsriGrid();
  HeaderState seen;
  bool inHeader = true;
  std::int64_t expected = 0;
  std::string text;
  long line = 0;
  while (std::getline(in, text)) {
    ++line;
    std::istringstream tokens(text);
    std::string token;
    if (inHeader) {
      if (!(tokens >> token)) continue;
      if (startsHeaderKeyword(token) && token != "nan" && token != "NaN" && token != "inf") {
        std::string value;
        std::string extra;
        if (!(tokens >> value) || (tokens >> extra)) {
          *error = at(line) + "header line must be 'keyword value'";
          return false;
        }
        if (!headerLine(token, value, line, grid, &seen, error)) return false;
        continue;
      }
      if (!checkHeader(seen, error)) return false;
      inHeader = false;
      expected = std::int64_t{grid->ncols} * grid->nrows;
      if (expected > kMaxValues) {
        *error = "ncols x nrows exceeds 2147483647 values";
        return false;
      }
      tokens.clear();
      tokens.str(text);
    }
    while (tokens >> token) {
      double value = 0.0;
      if (!parseNumber(token, &value) || (std::fabs(value) > FLT_MAX && !grid->isNodata(value))) {
        *error = at(line) + "bad grid value '" + token + "'";
        return false;
      }
      if (static_cast<std::int64_t>(grid->values.size()) >= expected) {
        *error = at(line) + "more values than ncols x nrows (" + std::to_string(expected) + ")";
        return false;
      }
      grid->values.push_back(value);
    }
  }
  if (in.bad()) {
    *error = "read error";
    return false;
  }
  if (inHeader) {
    if (!checkHeader(seen, error)) return false;
    expected = std::int64_t{grid->ncols} * grid->nrows;
  }
  if (static_cast<std::int64_t>(grid->values.size()) != expected) {
    *error = "expected " + std::to_string(expected) + " values (ncols x nrows), found " +
             std::to_string(grid->values.size());
    return false;
  }
  return true;
}

bool readEsriAsciiFile(const std::string& path, EsriGrid* grid, std::string* error) {
  std::ifstream in(path);
  if (!in) {
    if (error != nullptr) *error = "cannot open " + path;
    return false;
  }
  if (!parseEsriAscii(in, grid, error)) {
    if (error != nullptr) *error = path + ": " + *error;
    return false;
  }
  return true;
}

bool parseNumber(const std::string& token, double* value) {
  if (token.empty()) return false;
  errno = 0;
  char* end = nullptr;
  const double v = std::strtod(token.c_str(), &end);
  if (end != token.c_str() + token.size() || errno == ERANGE || !std::isfinite(v)) return false;
  *value = v;
  return true;
}

}  // namespace karnet::mkgrid
