#!/usr/bin/env bash
# Installs the build into a fresh prefix and checks that every program is there and answers
# --version with its name and the project's version.
set -euo pipefail
build=$1 version=$2
prefix=$(mktemp -d)
trap 'rm -rf "$prefix"' EXIT
cmake --install "$build" --prefix "$prefix" > /dev/null
for program in karnet karnet-mkgrid karnet-obs karnet-plot; do
  [ -x "$prefix/bin/$program" ] || { echo "not installed: $program"; exit 1; }
  answer=$("$prefix/bin/$program" --version)
  case "$answer" in
    *"$program"*"$version"*) echo "$answer" ;;
    *) echo "$program --version said: $answer"; exit 1 ;;
  esac
done
