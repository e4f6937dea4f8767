#!/usr/bin/env bash
# Whole test suite: set up, build, run every test through CTest.
set -euo pipefail
here=$(cd "$(dirname "$0")/.." && pwd)
"$here/scripts/setup.sh"
build=${VANTISH_BUILD_DIR:-$here/build}
cd "$build"
ctest --output-on-failure -j"$(nproc)" "$@"
