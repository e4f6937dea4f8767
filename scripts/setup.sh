#!/usr/bin/env bash
# Installs the Debian packages the build needs (only those missing) and a
# locale with a decimal comma for the tests, then configures (Ninja) and
# builds into ./build (or $VANTISH_BUILD_DIR).
#   VANTISH_BUILD_TYPE     CMake build type (default RelWithDebInfo)
#   VANTISH_CMAKE_ARGS     more CMake arguments, e.g. "-DVANTISH_BENCH=OFF"
#   VANTISH_BUILD_TARGETS  what to build (default: everything)
set -euo pipefail
here=$(cd "$(dirname "$0")/.." && pwd)
build=${VANTISH_BUILD_DIR:-$here/build}
build_type=${VANTISH_BUILD_TYPE:-RelWithDebInfo}

packages=(
  build-essential cmake ninja-build pkg-config
  libgtest-dev libgmock-dev libbenchmark-dev
  libopenblas-dev libsqlite3-dev
  nlohmann-json3-dev libcli11-dev liblcms2-dev colord-data
  libeigen3-dev libxml2-dev clang libclang-rt-14-dev clang-format
  locales
)

if [ "$(id -u)" -ne 0 ]; then SUDO=sudo; else SUDO=; fi
missing=()
for p in "${packages[@]}"; do
  dpkg-query -W -f='${Status}' "$p" 2>/dev/null | grep -q "install ok installed" || missing+=("$p")
done
if [ ${#missing[@]} -gt 0 ]; then
  echo "setup: installing ${missing[*]}" >&2
  $SUDO apt-get update -qq
  DEBIAN_FRONTEND=noninteractive $SUDO apt-get install -y -qq --no-install-recommends "${missing[@]}" >/dev/null
fi

# The database files must read and write the same under a locale whose
# decimal separator is a comma (tests/lightdb); de_DE.UTF-8 is one.
if ! locale -a 2>/dev/null | grep -qix 'de_DE\.utf-\?8'; then
  echo "setup: generating the de_DE.UTF-8 locale" >&2
  [ -f /etc/locale.gen ] && $SUDO sed -i 's/^# *de_DE.UTF-8 UTF-8$/de_DE.UTF-8 UTF-8/' /etc/locale.gen
  grep -q '^de_DE.UTF-8 UTF-8' /etc/locale.gen 2>/dev/null ||
    echo 'de_DE.UTF-8 UTF-8' | $SUDO tee -a /etc/locale.gen >/dev/null
  $SUDO locale-gen >/dev/null
fi

# Ninja for a new build folder; one configured before keeps its generator.
generator=()
[ -f "$build/CMakeCache.txt" ] || generator=(-G Ninja)
# shellcheck disable=SC2086 # VANTISH_CMAKE_ARGS holds several arguments
cmake "${generator[@]}" -S "$here" -B "$build" -DCMAKE_BUILD_TYPE="$build_type" ${VANTISH_CMAKE_ARGS:-} >/dev/null
# shellcheck disable=SC2086 # VANTISH_BUILD_TARGETS holds several targets
cmake --build "$build" -j"$(nproc)" ${VANTISH_BUILD_TARGETS:+--target $VANTISH_BUILD_TARGETS}
