#!/usr/bin/env bash
# Builds the libFuzzer harnesses of tests/fuzz with clang, AddressSanitizer and
# UndefinedBehaviorSanitizer (in build-fuzz/) and runs each one.
#   scripts/fuzz.sh [SECONDS] [HARNESS...]   SECONDS per harness (default $FUZZ_SECONDS, else
#                                             30: the seven harnesses take about 3.5 minutes);
#                                             all harnesses unless some are named
#   FUZZ_RUNS=N scripts/fuzz.sh              stops each harness after N inputs instead
#   FUZZ_TIMEOUT=S                           seconds one input may take (default 20; raise it
#                                             for long runs beside other work, where a starved
#                                             process can pass 20 s of wall time on any input)
# New inputs go to build-fuzz/corpus/<harness>/ (the seeds in tests/fuzz/corpus/ stay as
# they are); an input that fails is saved in build-fuzz/artifacts/ and the script exits 1.
set -euo pipefail
cd "$(dirname "$0")/.."

seconds=${1:-${FUZZ_SECONDS:-30}}
shift || true
harnesses=("$@")
[ ${#harnesses[@]} -gt 0 ] || harnesses=(parameter_file observation_lines bathymetry esri_ascii source_raster obs_table argo)
jobs=$(nproc 2>/dev/null || echo 2)

CC=clang CXX=clang++ cmake -S . -B build-fuzz -DCMAKE_BUILD_TYPE=RelWithDebInfo \
  -DKARNET_FUZZ=ON -DKARNET_BUILD_TESTS=OFF >/dev/null
targets=()
for h in "${harnesses[@]}"; do targets+=("fuzz_$h"); done
cmake --build build-fuzz -j "$jobs" --target "${targets[@]}"

mkdir -p build-fuzz/artifacts
status=0
for h in "${harnesses[@]}"; do
  case "$h" in
    parameter_file) max_len=16384 ;;
    observation_lines) max_len=8192 ;;
    bathymetry) max_len=65536 ;;
    esri_ascii) max_len=8192 ;;
    source_raster) max_len=65536 ;;
    obs_table) max_len=8192 ;;
    argo) max_len=65536 ;;
    *) echo "fuzz.sh: unknown harness $h" >&2; exit 2 ;;
  esac
  mkdir -p "build-fuzz/corpus/$h"
  if [ -n "${FUZZ_RUNS:-}" ]; then limit=(-runs="$FUZZ_RUNS"); else limit=(-max_total_time="$seconds"); fi
  echo "== fuzz_$h"
  # Leak reports are off: a failed read may keep what the checked allocator
  # handed out until the process ends, as a run does. NetCDF's classic-format
  # reader allocates what a header declares before reading it (gigabytes from a
  # tiny file); such requests fail here as they would on a small machine, so
  # that the reading code's answer to a failed allocation is what gets tested.
  log="build-fuzz/fuzz_$h.log"
  rc=0
  ASAN_OPTIONS=detect_leaks=0:allocator_may_return_null=1:max_allocation_size_mb=2048 UBSAN_OPTIONS=print_stacktrace=1:halt_on_error=1 \
    "build-fuzz/tests/fuzz/fuzz_$h" "${limit[@]}" -max_len="$max_len" -timeout="${FUZZ_TIMEOUT:-20}" \
    -rss_limit_mb=4096 -malloc_limit_mb=8192 -print_final_stats=1 \
    -artifact_prefix="build-fuzz/artifacts/$h-" \
    "build-fuzz/corpus/$h" "tests/fuzz/corpus/$h" >"$log" 2>&1 || rc=$?
  grep -E '^(stat::number_of_executed_units|stat::average_exec_per_sec|Done|==[0-9]+==ERROR|SUMMARY)' "$log" || true
  if [ "$rc" != 0 ]; then
    tail -n 60 "$log"
    echo "fuzz.sh: fuzz_$h failed (exit $rc); the input is in build-fuzz/artifacts/" >&2
    status=1
  fi
done
exit $status
