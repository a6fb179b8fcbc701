#!/bin/sh
# Runs karnet plainly and under mpirun with 1, 2, 3 and 4 ranks on each case
# and checks that every run gives the same exit code, standard error stream,
# log (but for its CPU time) and the same files, byte for byte.
#
#   scripts/mpi-compare.sh [-n "1 2 3 4"] KARNET CASE...
#
# CASE is a folder holding case.pfs, or a parameter file. Each run works in a
# copy of the case's folder. Exit code 0 when every case is the same in every
# run, 1 otherwise.
set -u
ranks="1 2 3 4"
if [ "${1:-}" = "-n" ]; then ranks="$2"; shift 2; fi
if [ $# -lt 2 ]; then
  echo "usage: $0 [-n \"1 2 3 4\"] KARNET CASE..." >&2
  exit 2
fi
karnet=$(readlink -f "$1")
shift
mpirun=${MPIRUN:-mpirun}
# The result's history carries the time of the run: one time for all runs.
export SOURCE_DATE_EPOCH=${SOURCE_DATE_EPOCH:-1700000000}
# Many ranks on one machine, also as root (as in a container).
export OMPI_ALLOW_RUN_AS_ROOT=1 OMPI_ALLOW_RUN_AS_ROOT_CONFIRM=1 OMPI_MCA_rmaps_base_oversubscribe=1
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT

# run NAME DIR PFS [LAUNCHER...]: runs in a fresh copy $work/NAME of DIR.
run() {
  name=$1 dir=$2 pfs=$3
  shift 3
  rm -rf "$work/$name"
  cp -r "$dir" "$work/$name"
  (cd "$work/$name" && "$@" "$karnet" "$pfs" > "$work/$name.out" 2> "$work/$name.err")
  echo $? > "$work/$name.rc"
  log="$work/$name/${pfs%.*}.log"
  if [ -f "$log" ]; then
    grep -v "CPU time" "$log" > "$work/$name.log"
    rm -f "$log"
  fi
}

failed=0
for case in "$@"; do
  if [ -d "$case" ]; then dir=$case pfs=case.pfs; else dir=$(dirname "$case") pfs=$(basename "$case"); fi
  run plain "$dir" "$pfs"
  verdict="same"
  for n in $ranks; do
    # mpirun names itself in messages of its own: keep only karnet's lines.
    run "np$n" "$dir" "$pfs" "$mpirun" -np "$n"
    grep "^karnet" "$work/np$n.err" > "$work/np$n.err.k"
    grep "^karnet" "$work/plain.err" > "$work/plain.err.k"
    for what in rc err.k log out; do
      if ! cmp -s "$work/plain.$what" "$work/np$n.$what"; then
        verdict="DIFFERENT with $n ranks: $what"
        diff "$work/plain.$what" "$work/np$n.$what" | head -5
        break
      fi
    done
    [ "$verdict" = same ] || break
    if ! diff -r "$work/plain" "$work/np$n" > "$work/files.diff"; then
      verdict="DIFFERENT with $n ranks: files"
      head -5 "$work/files.diff"
      break
    fi
  done
  echo "$case: exit $(cat "$work/plain.rc"), $verdict"
  [ "$verdict" = same ] || failed=1
done
exit $failed
