#!/usr/bin/env bash
# Installs every Debian package that karnet's build, tests and example need, when missing.
# Run as root (or through sudo) on Debian 12.
set -euo pipefail

packages=(
  build-essential cmake
  libgtest-dev libgmock-dev
  libnetcdf-dev netcdf-bin libhdf5-dev libdeflate-dev
  libproj-dev proj-data
  python3 python3-numpy python3-netcdf4 python3-xarray
  libgdal-dev gdal-bin python3-gdal cdo
  python3-matplotlib
  libbenchmark-dev
  clang libclang-rt-14-dev
  openmpi-bin libopenmpi-dev
)

missing=()
for p in "${packages[@]}"; do
  if ! dpkg-query -W -f='${Status}' "$p" 2>/dev/null | grep -q "install ok installed"; then
    missing+=("$p")
  fi
done

if [ ${#missing[@]} -eq 0 ]; then
  echo "install-deps: all packages present"
  exit 0
fi

SUDO=""
if [ "$(id -u)" -ne 0 ]; then SUDO="sudo"; fi
echo "install-deps: installing ${missing[*]}"
$SUDO apt-get update
DEBIAN_FRONTEND=noninteractive $SUDO apt-get install -y --no-install-recommends "${missing[@]}"
