#ifndef KARNET_TOOLS_OBS_Z_FROM_P_H_
#define KARNET_TOOLS_OBS_Z_FROM_P_H_

namespace karnet::obs {

// Height in metres (negative below the sea surface) of sea pressure p (dbar, absolute pressure
// minus 10.1325 dbar) at latitude lat (degrees), by TEOS-10's z_from_p with zero dynamic height
// and zero sea-surface geopotential: the column is Standard Ocean water (SA = 35.16504 g/kg,
// CT = 0 degC), gravity follows latitude and falls off linearly with height.
double zFromPressure(double p, double lat);

// The dynamic enthalpy of that water at pressure p (dbar), J/kg: the pressure integral of the
// 75-term specific-volume polynomial at SA = 35.16504 g/kg, CT = 0 degC.
double enthalpyStandardOcean(double p);

}  // namespace karnet::obs

#endif  // KARNET_TOOLS_OBS_Z_FROM_P_H_
