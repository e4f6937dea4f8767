#!/usr/bin/env bash
# Installs the Debian packages the build needs (only those missing), then
# configures and builds into ./build (or $VANTISH_BUILD_DIR).
set -euo pipefail
here=$(cd "$(dirname "$0")/.." && pwd)
build=${VANTISH_BUILD_DIR:-$here/build}
build_type=${VANTISH_BUILD_TYPE:-RelWithDebInfo}

packages=(
  build-essential cmake pkg-config
  libgtest-dev libgmock-dev libbenchmark-dev
  libopenblas-dev libsqlite3-dev
  nlohmann-json3-dev libcli11-dev liblcms2-dev colord-data
  libeigen3-dev libxml2-dev clang libclang-rt-14-dev clang-format
)

missing=()
for p in "${packages[@]}"; do
  dpkg-query -W -f='${Status}' "$p" 2>/dev/null | grep -q "install ok installed" || missing+=("$p")
done
if [ ${#missing[@]} -gt 0 ]; then
  echo "setup: installing ${missing[*]}" >&2
  if [ "$(id -u)" -ne 0 ]; then SUDO=sudo; else SUDO=; fi
  $SUDO apt-get update -qq
  DEBIAN_FRONTEND=noninteractive $SUDO apt-get install -y -qq --no-install-recommends "${missing[@]}" >/dev/null
fi

cmake -S "$here" -B "$build" -DCMAKE_BUILD_TYPE="$build_type" ${VANTISH_CMAKE_ARGS:-} >/dev/null
cmake --build "$build" -j"$(nproc)" ${VANTISH_BUILD_TARGETS:+--target $VANTISH_BUILD_TARGETS}
