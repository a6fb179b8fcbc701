#!/usr/bin/env bash
# Installs what is missing, builds karnet and runs the examples shipped in examples/:
#   examples/basin        a coastal basin with an island and CTD casts (bilinear and objective)
#   examples/nw_atlantic  real Argo profiles over a real bathymetry (objective analysis)
# Prints where each result and log lies.
set -euo pipefail
cd "$(dirname "$0")/.."
root=$(pwd)

./scripts/install-deps.sh
jobs=$(nproc 2>/dev/null || echo 2)
cmake -S . -B build -DCMAKE_BUILD_TYPE=Release -DKARNET_BUILD_TESTS=OFF
cmake --build build -j "$jobs" --target karnet karnet-mkgrid

karnet="$root/build/karnet"
mkgrid="$root/build/tools/karnet-mkgrid"
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

if command -v ncdump > /dev/null; then
  echo
  echo "== ncdump -h examples/basin/result_bilinear.nc (head)"
  ncdump -h "$root/examples/basin/result_bilinear.nc" | head -n 30 || true
fi
exit $status
