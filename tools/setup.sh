#!/usr/bin/env bash
# Installs what is missing (Debian packages, with apt-get) and builds Qorvex into build/.
# clang and its runtime libraries build the fuzz harnesses (tests/fuzz); g++ builds everything else.
# Usage: tools/setup.sh [--no-build]
set -euo pipefail
top=$(cd "$(dirname "$0")/.." && pwd)
packages=(g++ cmake ninja-build pkg-config libtiff-dev libgeotiff-dev libexpat1-dev libfftw3-dev
          libmpfr-dev libgmp-dev libgtest-dev libgmock-dev libbenchmark-dev gdal-bin
          clang libclang-rt-14-dev libomp-14-dev snakemake)
missing=()
for p in "${packages[@]}"; do
  dpkg-query -W -f='${Status}' "$p" 2>/dev/null | grep -q "install ok installed" || missing+=("$p")
done
if [ ${#missing[@]} -gt 0 ]; then
  echo "setup: installing ${missing[*]}"
  sudo=""
  [ "$(id -u)" -eq 0 ] || sudo="sudo"
  $sudo apt-get update -qq
  DEBIAN_FRONTEND=noninteractive $sudo apt-get install -y -qq "${missing[@]}" >/dev/null
fi
[ "${1:-}" = "--no-build" ] && exit 0
generator=()
command -v ninja >/dev/null && generator=(-G Ninja)
launcher=()
command -v ccache >/dev/null && launcher=(-DCMAKE_CXX_COMPILER_LAUNCHER=ccache -DCMAKE_C_COMPILER_LAUNCHER=ccache)
if [ ! -f "$top/build/CMakeCache.txt" ]; then
  cmake -S "$top" -B "$top/build" "${generator[@]}" "${launcher[@]}" -DCMAKE_BUILD_TYPE=Release >/dev/null
fi
cmake --build "$top/build" -j "$(nproc)"
