#!/usr/bin/env bash
# Installs what is missing, builds karnet and runs the examples shipped in examples/:
#   examples/basin        a coastal basin with an island and CTD casts (bilinear and objective)
#   examples/nw_atlantic  real Argo profiles over a real bathymetry (objective analysis)
#   examples/angola_basin from raw files as users download them: a longitude/latitude ETOPO2
#                         excerpt and an Argo multi-profile file, through karnet-mkgrid,
#                         karnet-obs, karnet and karnet-plot
# Prints where each result, log and picture lies.
set -euo pipefail
cd "$(dirname "$0")/.."
root=$(pwd)

./scripts/install-deps.sh
jobs=$(nproc 2>/dev/null || echo 2)
cmake -S . -B build -DCMAKE_BUILD_TYPE=Release -DKARNET_BUILD_TESTS=OFF
cmake --build build -j "$jobs" --target karnet karnet-mkgrid karnet-obs

karnet="$root/build/karnet"
mkgrid="$root/build/tools/karnet-mkgrid"
obs="$root/build/tools/karnet-obs"
plot="$root/build/tools/plot/karnet-plot"
status=0

run_case() {  # directory, parameter file, result file
  local dir=$1 pfs=$2 result=$3 rc=0
  echo
  echo "== karnet $dir/$pfs"
  (cd "$dir" && "$karnet" "$pfs") || rc=$?
  local log="$dir/${pfs%.pfs}.log"
  grep -E '^(WARNING|No\. of|-- Completion)' "$log" || true
  if [ "$rc" -eq 0 ] && [ -f "$dir/$result" ]; then
    echo "result: $dir/$result"
  else
    echo "the run failed (exit code $rc)"
    status=1
  fi
  echo "log:    $log"
}

# The basin's bathymetry comes from an ESRI ASCII grid; its grid is turned 15 degrees.
"$mkgrid" --projection UTM-32 --orientation 15 --title "Basin example bathymetry" \
  examples/basin/basin.asc examples/basin/bathymetry.nc
run_case "$root/examples/basin" basin.pfs result_bilinear.nc
run_case "$root/examples/basin" basin_oa.pfs result_objective.nc
run_case "$root/examples/nw_atlantic" case.pfs result_objective.nc

# From raw files: the bathymetry is resampled from longitude/latitude onto a 5 km grid in the
# UTM zone of the region (auto: 31S); the Argo profiles are projected onto it, their pressures
# turned into depths and their quality flags checked.
angola="$root/examples/angola_basin"
echo
echo "== karnet-mkgrid, karnet-obs: $angola"
"$mkgrid" "$angola/etopo2_excerpt.nc" --projection auto --spacing 5000 \
  --extent -0.1,-9.6,5.0,-5.8 --title "Angola Basin, ETOPO2" "$angola/bathymetry.nc"
"$obs" --bathymetry "$angola/bathymetry.nc" --box -0.1,-9.6,5.0,-5.8 \
  "$angola/3902131_prof.nc" -o "$angola/observations.txt"
run_case "$angola" case.pfs result_objective.nc

echo
echo "== karnet-plot: pictures"
pictures() {  # result, observations, bathymetry, section row, prefix
  "$plot" map "$1" --depth 1000 --obs "$2" -o "$5_map_1000m.png" &&
  "$plot" map "$1" --depth 100 --obs "$2" -o "$5_map_100m.png" &&
  "$plot" section "$1" --row "$4" -o "$5_section.png" &&
  "$plot" bathymetry "$3" --obs "$2" -o "$5_bathymetry.png" &&
  echo "pictures: $5_*.png" || status=1
}
pictures "$angola/result_objective.nc" "$angola/observations.txt" "$angola/bathymetry.nc" 60 \
  "$angola/angola"
pictures "$root/examples/nw_atlantic/result_objective.nc" \
  "$root/examples/nw_atlantic/observations.txt" "$root/examples/nw_atlantic/bathymetry.nc" 60 \
  "$root/examples/nw_atlantic/nw_atlantic"
"$plot" map "$root/examples/basin/result_objective.nc" --depth 5 \
  --obs "$root/examples/basin/casts.txt" -o "$root/examples/basin/basin_map_5m.png" &&
  "$plot" section "$root/examples/basin/result_objective.nc" --row 30 \
    -o "$root/examples/basin/basin_section.png" &&
  echo "pictures: $root/examples/basin/basin_*.png" || status=1

if command -v ncdump > /dev/null; then
  echo
  echo "== ncdump -h examples/basin/result_bilinear.nc (head)"
  ncdump -h "$root/examples/basin/result_bilinear.nc" | grep -v -E "crs_wkt|spatial_ref" | head -n 40 || true
fi
exit $status
