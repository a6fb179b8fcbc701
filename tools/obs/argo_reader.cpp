// Argo profile files (Argo user's manual layout): one value per profile and level, with a
// quality flag per value and per profile position and date.
#include "obs/argo_reader.h"

#include <netcdf.h>

#include <charconv>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <vector>

#include "obs/iso_time.h"

namespace karnet::obs {

namespace {

class NcFile {
 public:
  explicit NcFile(const std::string& path) : path_(path) {
    const int status = nc_open(path.c_str(), NC_NOWRITE, &id_);
    if (status != NC_NOERR) {
      throw ObsError(path + ": cannot read as NetCDF: " + nc_strerror(status));
    }
  }
  ~NcFile() { nc_close(id_); }
  NcFile(const NcFile&) = delete;
  NcFile& operator=(const NcFile&) = delete;

  int var(const std::string& name) const {
    int id = -1;
    return nc_inq_varid(id_, name.c_str(), &id) == NC_NOERR ? id : -1;
  }
  bool has(const std::string& name) const { return var(name) >= 0; }

  // Length and id of a dimension that must be there.
  std::size_t dimension(const char* name, int* dimId) const {
    std::size_t length = 0;
    if (nc_inq_dimid(id_, name, dimId) != NC_NOERR || nc_inq_dimlen(id_, *dimId, &length) != NC_NOERR) {
      throw ObsError(path_ + ": no dimension " + name + " (not an Argo profile file?)");
    }
    return length;
  }

  // Checks that the variable lies on exactly the given dimensions; gives its id.
  int shaped(const std::string& name, const std::vector<int>& dims) const {
    const int id = var(name);
    if (id < 0) throw ObsError(path_ + ": no variable " + name);
    int ndims = 0;
    nc_inq_varndims(id_, id, &ndims);
    std::vector<int> actual(static_cast<std::size_t>(ndims));
    if (ndims > 0) nc_inq_vardimid(id_, id, actual.data());
    if (actual != dims) {
      throw ObsError(path_ + ": variable " + name + " does not lie on the dimensions " +
                     (dims.size() == 1 ? "(N_PROF)" : "(N_PROF, N_LEVELS)"));
    }
    return id;
  }

  void check(int status, const std::string& name) const {
    if (status != NC_NOERR) {
      throw ObsError(path_ + ": cannot read variable " + name + ": " + nc_strerror(status));
    }
  }

  int id() const { return id_; }
  const std::string& path() const { return path_; }

 private:
  std::string path_;
  int id_ = -1;
};

// Values of a numeric variable with its fill value. Single-precision values are taken as the
// shortest decimal that the float stands for (12.345f is 12.345, not 12.345000267...), which is
// what the data centre wrote.
struct Numbers {
  std::vector<double> values;
  double fill = NC_FILL_DOUBLE;
  bool missing(std::size_t i) const {
    const double v = values[i];
    return std::isnan(v) || v == fill || std::fabs(v) >= 99999.0;
  }
};

Numbers readNumbers(const NcFile& file, const std::string& name, const std::vector<int>& dims,
                    std::size_t count) {
  const int id = file.shaped(name, dims);
  nc_type type = NC_NAT;
  file.check(nc_inq_vartype(file.id(), id, &type), name);
  if (type == NC_CHAR || type == NC_STRING) {
    throw ObsError(file.path() + ": variable " + name + " is not numeric");
  }
  Numbers out;
  out.values.resize(count);
  if (type == NC_FLOAT) {
    std::vector<float> raw(count);
    if (count > 0) file.check(nc_get_var_float(file.id(), id, raw.data()), name);
    for (std::size_t i = 0; i < count; ++i) {
      char text[32];
      const auto end = std::to_chars(text, text + sizeof text, raw[i]).ptr;
      std::from_chars(text, end, out.values[i]);
      if (std::isnan(raw[i])) out.values[i] = std::nan("");
    }
    out.fill = NC_FILL_FLOAT;
  } else if (count > 0) {
    file.check(nc_get_var_double(file.id(), id, out.values.data()), name);
  }
  nc_type attType = NC_NAT;
  std::size_t attLength = 0;
  if (nc_inq_att(file.id(), id, "_FillValue", &attType, &attLength) == NC_NOERR && attLength == 1) {
    if (type == NC_FLOAT) {
      float fill = 0.0f;
      nc_get_att_float(file.id(), id, "_FillValue", &fill);
      char text[32];
      const auto end = std::to_chars(text, text + sizeof text, fill).ptr;
      std::from_chars(text, end, out.fill);
    } else {
      nc_get_att_double(file.id(), id, "_FillValue", &out.fill);
    }
  }
  return out;
}

std::vector<char> readFlags(const NcFile& file, const std::string& name,
                            const std::vector<int>& dims, std::size_t count) {
  const int id = file.shaped(name, dims);
  nc_type type = NC_NAT;
  file.check(nc_inq_vartype(file.id(), id, &type), name);
  if (type != NC_CHAR) throw ObsError(file.path() + ": variable " + name + " is not of type char");
  std::vector<char> flags(count, ' ');
  if (count > 0) file.check(nc_get_var_text(file.id(), id, flags.data()), name);
  return flags;
}

std::string textAttribute(const NcFile& file, int var, const char* name) {
  nc_type type = NC_NAT;
  std::size_t length = 0;
  if (nc_inq_att(file.id(), var, name, &type, &length) != NC_NOERR || type != NC_CHAR) return {};
  std::string text(length, '\0');
  if (length > 0) nc_get_att_text(file.id(), var, name, text.data());
  while (!text.empty() && text.back() == '\0') text.pop_back();
  return text;
}

std::string upper(std::string text) {
  for (char& c : text) c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
  return text;
}

// A flag as the filter sees it: blank or NUL (no flag given) is '0', "no QC performed".
char flagOf(char c) { return c == ' ' || c == '\0' ? '0' : c; }

}  // namespace

bool looksLikeNetcdf(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  char magic[4] = {};
  if (!in.read(magic, 4)) return false;
  return std::memcmp(magic, "CDF\x01", 4) == 0 || std::memcmp(magic, "CDF\x02", 4) == 0 ||
         std::memcmp(magic, "CDF\x05", 4) == 0 || std::memcmp(magic, "\x89HDF", 4) == 0;
}

void readArgo(const std::string& path, const ReadOptions& options, const RowSink& sink,
              const std::function<void(const std::string&)>& note) {
  const NcFile file(path);
  int profDim = -1, levelDim = -1;
  const std::size_t nProf = file.dimension("N_PROF", &profDim);
  const std::size_t nLevels = file.dimension("N_LEVELS", &levelDim);
  const std::vector<int> perProfile{profDim};
  const std::vector<int> perLevel{profDim, levelDim};
  const std::size_t nValues = nProf * nLevels;
  const std::string variable = upper(options.variable);

  const Numbers lon = readNumbers(file, "LONGITUDE", perProfile, nProf);
  const Numbers lat = readNumbers(file, "LATITUDE", perProfile, nProf);
  const Numbers presRaw = readNumbers(file, "PRES", perLevel, nValues);
  const Numbers varRaw = readNumbers(file, variable, perLevel, nValues);

  // Optional parts: each one missing means that check cannot be made.
  auto optionalFlags = [&](const std::string& name, const std::vector<int>& dims,
                           std::size_t count) -> std::vector<char> {
    if (file.has(name)) return readFlags(file, name, dims, count);
    note(path + ": no " + name + ", those flags are not checked");
    return {};
  };
  const std::vector<char> positionQc = optionalFlags("POSITION_QC", perProfile, nProf);
  const std::vector<char> presRawQc = optionalFlags("PRES_QC", perLevel, nValues);
  const std::vector<char> varRawQc = optionalFlags(variable + "_QC", perLevel, nValues);

  Numbers juld;
  std::vector<char> juldQc;
  double reference = 0.0;
  const bool hasJuld = file.has("JULD");
  if (hasJuld) {
    juld = readNumbers(file, "JULD", perProfile, nProf);
    const std::string units = textAttribute(file, file.var("JULD"), "units");
    if (!units.empty() && !parseDaysSinceUnit(units, &reference)) {
      throw ObsError(path + ": JULD has units \"" + units + "\", not days since a date");
    }
    juldQc = optionalFlags("JULD_QC", perProfile, nProf);
  } else if (options.needTime) {
    throw ObsError(path + ": no variable JULD for --from / --to");
  }

  const bool hasAdjusted = !options.raw && file.has("PRES_ADJUSTED") &&
                           file.has(variable + "_ADJUSTED");
  Numbers presAdj, varAdj;
  std::vector<char> presAdjQc, varAdjQc;
  if (hasAdjusted) {
    presAdj = readNumbers(file, "PRES_ADJUSTED", perLevel, nValues);
    varAdj = readNumbers(file, variable + "_ADJUSTED", perLevel, nValues);
    presAdjQc = file.has("PRES_ADJUSTED_QC")
                    ? readFlags(file, "PRES_ADJUSTED_QC", perLevel, nValues) : presRawQc;
    varAdjQc = file.has(variable + "_ADJUSTED_QC")
                   ? readFlags(file, variable + "_ADJUSTED_QC", perLevel, nValues) : varRawQc;
  }
  std::vector<char> dataMode;
  if (file.has("DATA_MODE")) dataMode = readFlags(file, "DATA_MODE", perProfile, nProf);

  auto good = [&](const std::vector<char>& flags, std::size_t i) {
    return flags.empty() || options.goodFlags.count(flagOf(flags[i])) > 0;
  };

  for (std::size_t p = 0; p < nProf; ++p) {
    const std::size_t first = p * nLevels;
    bool adjusted = false;
    if (hasAdjusted) {
      const char mode = dataMode.empty() ? ' ' : dataMode[p];
      if (mode == 'A' || mode == 'D') {
        adjusted = true;
      } else if (mode != 'R') {
        for (std::size_t l = 0; l < nLevels && !adjusted; ++l) adjusted = !varAdj.missing(first + l);
      }
    }
    const Numbers& pres = adjusted ? presAdj : presRaw;
    const Numbers& value = adjusted ? varAdj : varRaw;
    const std::vector<char>& presQc = adjusted ? presAdjQc : presRawQc;
    const std::vector<char>& valueQc = adjusted ? varAdjQc : varRawQc;
    const bool positionMissing = lon.missing(p) || lat.missing(p);
    const bool timeMissing = !hasJuld || juld.missing(p);
    const bool profileGood = good(positionQc, p) && (!hasJuld || good(juldQc, p));

    for (std::size_t l = 0; l < nLevels; ++l) {
      const std::size_t i = first + l;
      const bool exists = !presRaw.missing(i) || !varRaw.missing(i) ||
                          (hasAdjusted && (!presAdj.missing(i) || !varAdj.missing(i)));
      if (!exists) continue;
      Row row;
      row.isPressure = true;
      row.lon = lon.values[p];
      row.lat = lat.values[p];
      row.vertical = pres.values[i];
      row.value = value.values[i];
      if (!timeMissing) row.time = reference + juld.values[p];
      if (positionMissing || pres.missing(i) || value.missing(i) ||
          (options.needTime && timeMissing)) {
        row.skip = Skip::Missing;
      } else if (!profileGood || !good(presQc, i) || !good(valueQc, i)) {
        row.skip = Skip::BadQc;
      }
      const Where where = [&path, p, l, adjusted] {
        return path + ": profile " + std::to_string(p + 1) + ", level " + std::to_string(l + 1) +
               (adjusted ? " (adjusted values)" : "");
      };
      sink(row, where);
    }
  }
}

}  // namespace karnet::obs
