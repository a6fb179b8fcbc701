#ifndef KARNET_TESTS_TOOLS_OBS_ARGO_CDL_H_
#define KARNET_TESTS_TOOLS_OBS_ARGO_CDL_H_

#include <string>

#include "gridfile/nc_test_files.h"

namespace karnet::test {

// An Argo-style multi-profile file of three profiles of four levels:
//  1: delayed mode at 60W 40N, 2007-05-01 12:00; adjusted pressure and temperature differ from
//     the raw ones; level 3's adjusted temperature is flagged 4; level 4 is padding.
//  2: real time at 59W 41N, 2007-05-02 12:00; level 2's temperature is a fill value, level 4's
//     is flagged 3; no adjusted values.
//  3: adjusted mode at 58W 42N with its position flagged 4 and no date; two levels.
constexpr const char* kArgoCdl = R"(netcdf argo {
dimensions:
  N_PROF = 3 ;
  N_LEVELS = 4 ;
variables:
  char DATA_MODE(N_PROF) ;
    DATA_MODE:_FillValue = " " ;
  double JULD(N_PROF) ;
    JULD:units = "days since 1950-01-01 00:00:00 UTC" ;
    JULD:_FillValue = 999999. ;
  char JULD_QC(N_PROF) ;
  double LATITUDE(N_PROF) ;
    LATITUDE:_FillValue = 99999. ;
  double LONGITUDE(N_PROF) ;
    LONGITUDE:_FillValue = 99999. ;
  char POSITION_QC(N_PROF) ;
  float PRES(N_PROF, N_LEVELS) ;
    PRES:_FillValue = 99999.f ;
  char PRES_QC(N_PROF, N_LEVELS) ;
  float PRES_ADJUSTED(N_PROF, N_LEVELS) ;
    PRES_ADJUSTED:_FillValue = 99999.f ;
  char PRES_ADJUSTED_QC(N_PROF, N_LEVELS) ;
  float TEMP(N_PROF, N_LEVELS) ;
    TEMP:_FillValue = 99999.f ;
  char TEMP_QC(N_PROF, N_LEVELS) ;
  float TEMP_ADJUSTED(N_PROF, N_LEVELS) ;
    TEMP_ADJUSTED:_FillValue = 99999.f ;
  char TEMP_ADJUSTED_QC(N_PROF, N_LEVELS) ;
data:
  DATA_MODE = "DRA" ;
  JULD = 20939.5, 20940.5, _ ;
  JULD_QC = "11 " ;
  LATITUDE = 40, 41, 42 ;
  LONGITUDE = -60, -59, -58 ;
  POSITION_QC = "114" ;
  PRES = 10, 20, 30, _,  5, 15, 25, 35,  100, 200, _, _ ;
  PRES_QC = "111 ", "1111", "11  " ;
  PRES_ADJUSTED = 10.5, 20.5, 30.5, _,  _, _, _, _,  100.2, 200.2, _, _ ;
  PRES_ADJUSTED_QC = "111 ", "    ", "11  " ;
  TEMP = 15, 14, 13, _,  16, _, 14, 13,  9, 8, _, _ ;
  TEMP_QC = "111 ", "1913", "11  " ;
  TEMP_ADJUSTED = 15.1, 14.1, 13.1, _,  _, _, _, _,  9.1, 8.1, _, _ ;
  TEMP_ADJUSTED_QC = "114 ", "    ", "11  " ;
}
)";

// Writes cdl through ncgen as the classic file dir/name and gives the path.
inline std::string ncgenFile(const TempDir& dir, const std::string& name, const std::string& cdl) {
  ncgen(dir.file(name), cdl, "classic");
  return dir.file(name);
}

}  // namespace karnet::test

#endif  // KARNET_TESTS_TOOLS_OBS_ARGO_CDL_H_
