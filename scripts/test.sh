#!/usr/bin/env bash
# Installs what is missing, builds karnet with its tests and runs every test; then builds the
# tests again with AddressSanitizer and UndefinedBehaviorSanitizer (in build-sanitize/) and
# runs them there too. Exit status 0 only when both pass.
# Then the threaded kernel tests run under ThreadSanitizer (with clang, in build-tsan/).
# Last, each libFuzzer harness runs for 30 seconds (scripts/fuzz.sh, in build-fuzz/;
# FUZZ_SECONDS=N for another time).
#   KARNET_NO_SANITIZE=1 scripts/test.sh   skips the sanitizer build.
#   KARNET_NO_TSAN=1 scripts/test.sh       skips the ThreadSanitizer build.
#   KARNET_NO_FUZZ=1 scripts/test.sh       skips the fuzzing.
set -euo pipefail
cd "$(dirname "$0")/.."

./scripts/install-deps.sh
jobs=$(nproc 2>/dev/null || echo 2)

cmake -S . -B build -DCMAKE_BUILD_TYPE=Release -DKARNET_BUILD_TESTS=ON
cmake --build build -j "$jobs"
(cd build && ctest --output-on-failure -j "$jobs")

if [ "${KARNET_NO_SANITIZE:-0}" != "1" ]; then
  cmake -S . -B build-sanitize -DCMAKE_BUILD_TYPE=Debug -DKARNET_SANITIZE=ON -DKARNET_BUILD_TESTS=ON
  cmake --build build-sanitize -j "$jobs"
  # Runs that end through exit() keep their arrays until the process ends; leak reports
  # there would only replace the exit codes that the tests check.
  (cd build-sanitize && ASAN_OPTIONS=detect_leaks=0 \
     UBSAN_OPTIONS=print_stacktrace=1:halt_on_error=1 ctest --output-on-failure -j "$jobs")
fi
if [ "${KARNET_NO_TSAN:-0}" != "1" ]; then
  # Only the threaded kernel tests, so that this stays short.
  CC=clang CXX=clang++ cmake -S . -B build-tsan -DCMAKE_BUILD_TYPE=RelWithDebInfo -DKARNET_TSAN=ON \
    -DKARNET_BUILD_TESTS=ON
  cmake --build build-tsan -j "$jobs" --target test_interp_threads test_analysis_threads
  (cd build-tsan && ctest --output-on-failure -j "$jobs" -L threads -R "interp_threads|analysis_threads")
fi
if [ "${KARNET_NO_FUZZ:-0}" != "1" ]; then
  ./scripts/fuzz.sh "${FUZZ_SECONDS:-30}"
fi
echo "test.sh: all tests passed"
