#!/usr/bin/env bash
# Installs the Debian packages the project needs when they are missing, then
# configures and builds. Usage: scripts/setup.sh [build-dir] [extra cmake args]
set -euo pipefail
top=$(cd "$(dirname "$0")/.." && pwd)
build=${1:-$top/build}
shift || true

packages=(cmake g++ make pkg-config libexpat1-dev libtiff-dev libgeotiff-dev libfftw3-dev libgtest-dev
          libbenchmark-dev gdal-bin geotiff-bin libtiff-tools libxml2-utils clang clang-tidy libclang-rt-14-dev libomp-dev
          python3-numpy python3-scipy time)
missing=()
for p in "${packages[@]}"; do
  dpkg-query -W -f='${Status}' "$p" 2>/dev/null | grep -q "install ok installed" || missing+=("$p")
done
if [ ${#missing[@]} -gt 0 ]; then
  echo "setup: installing ${missing[*]}"
  sudo_cmd=""
  [ "$(id -u)" -ne 0 ] && sudo_cmd=sudo
  $sudo_cmd apt-get update -qq
  DEBIAN_FRONTEND=noninteractive $sudo_cmd apt-get install -y -qq "${missing[@]}" >/dev/null
fi

cmake -S "$top" -B "$build" -DCMAKE_BUILD_TYPE=RelWithDebInfo "$@" >/dev/null
cmake --build "$build" -j"$(nproc)"
