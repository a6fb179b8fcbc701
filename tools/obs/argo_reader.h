#ifndef KARNET_TOOLS_OBS_ARGO_READER_H_
#define KARNET_TOOLS_OBS_ARGO_READER_H_

#include <string>

#include "obs/observation.h"

namespace karnet::obs {

// True when the file starts like a NetCDF file (classic, 64-bit offset or HDF5-based).
bool looksLikeNetcdf(const std::string& path);

// Reads an Argo profile file (a float's *_prof.nc or a single-profile file: dimensions N_PROF
// and N_LEVELS) and hands every level of every profile to sink, with pressure as the vertical
// coordinate. Per profile the *_ADJUSTED pressure and variable are taken when the data mode is
// A or D (or, without a data mode, when adjusted values are present), unless options.raw; the
// flags that go with the values taken are checked against options.goodFlags, as are
// POSITION_QC and JULD_QC. Levels without any value (the padding of short profiles) are not
// rows. Notes about the file (flags it lacks) go to note. Throws ObsError when the file cannot
// be read or lacks LONGITUDE, LATITUDE, PRES or the variable.
void readArgo(const std::string& path, const ReadOptions& options, const RowSink& sink,
              const std::function<void(const std::string&)>& note);

}  // namespace karnet::obs

#endif  // KARNET_TOOLS_OBS_ARGO_READER_H_
