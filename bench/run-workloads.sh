#!/bin/bash
# Times whole karnet runs on the benchmark workloads, with 1 thread and with N
# (KARNET_THREADS), and prints wall time, user time, million result nodes per
# second and peak memory (from /usr/bin/time -v).
#
# usage: bench/run-workloads.sh [-b BUILD_DIR] [-w WORKLOAD_DIR] [-t N] [-r REPEATS] [CASE...]
#   BUILD_DIR     where karnet and tools/karnet-mkgrid are (default build)
#   WORKLOAD_DIR  where the workloads are, made there by make_workloads.py when
#                 missing (default build/workloads)
#   N             the second thread count (default: the number of processors)
#   REPEATS       runs per case and thread count; the fastest is shown (default 1)
#   CASE          large_bilinear, large_oa, dense_oa (default all three)
set -euo pipefail
here=$(cd "$(dirname "$0")" && pwd)
root=$(dirname "$here")
build=$root/build
workloads=
threads=$(nproc)
repeats=1
while getopts "b:w:t:r:" option; do
  case $option in
    b) build=$(cd "$OPTARG" && pwd) ;;
    w) workloads=$OPTARG ;;
    t) threads=$OPTARG ;;
    r) repeats=$OPTARG ;;
    *) sed -n '2,13p' "$0" >&2; exit 1 ;;
  esac
done
shift $((OPTIND - 1))
workloads=${workloads:-$build/workloads}
cases=("$@")
[ ${#cases[@]} -gt 0 ] || cases=(large_bilinear large_oa dense_oa)

karnet=$build/karnet
[ -x "$karnet" ] || { echo "no karnet at $karnet (build it first)" >&2; exit 1; }
[ -x /usr/bin/time ] || { echo "needs /usr/bin/time (Debian package time)" >&2; exit 1; }
if [ ! -f "$workloads/large/large_oa.pfs" ] || [ ! -f "$workloads/dense/dense_oa.pfs" ]; then
  /usr/bin/python3 "$here/make_workloads.py" --mkgrid "$build/tools/karnet-mkgrid" "$workloads"
fi

# Result nodes of each case (x * y * z of the result grid).
declare -A nodes=([large_bilinear]=10000000 [large_oa]=10000000 [dense_oa]=51200)
declare -A folder=([large_bilinear]=large [large_oa]=large [dense_oa]=dense)

printf "%-15s %7s %9s %9s %12s %10s\n" case threads "wall s" "user s" "M nodes/s" "peak MiB"
for name in "${cases[@]}"; do
  [ -n "${folder[$name]:-}" ] || { echo "unknown case $name" >&2; exit 1; }
  for n in 1 "$threads"; do
    best=
    for ((r = 0; r < repeats; ++r)); do
      report=$(mktemp)
      (cd "$workloads/${folder[$name]}" && KARNET_THREADS=$n buildmode=nigth \
        /usr/bin/time -v -o "$report" "$karnet" "$name.pfs" >/dev/null 2>&1) ||
        { echo "$name failed, see $workloads/${folder[$name]}/$name.log" >&2; exit 1; }
      wall=$(awk -F': ' '/Elapsed \(wall clock\)/ {
               n = split($2, p, ":"); s = 0; for (i = 1; i <= n; ++i) s = s * 60 + p[i]; print s }' \
               "$report")
      user=$(awk -F': ' '/User time/ {print $2}' "$report")
      peak=$(awk -F': ' '/Maximum resident set size/ {printf "%.0f", $2 / 1024}' "$report")
      rm -f "$report"
      if [ -z "$best" ] || awk -v a="$wall" -v b="$best" 'BEGIN {exit !(a < b)}'; then
        best=$wall bestUser=$user bestPeak=$peak
      fi
    done
    rate=$(awk -v n="${nodes[$name]}" -v s="$best" 'BEGIN {printf "%.3f", n / s / 1e6}')
    printf "%-15s %7s %9s %9s %12s %10s\n" "$name" "$n" "$best" "$bestUser" "$rate" "$bestPeak"
    [ "$n" != "$threads" ] || break
  done
done
