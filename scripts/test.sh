#!/usr/bin/env bash
# Whole test suite: set up, build, run every test through CTest.
set -euo pipefail
here=$(cd "$(dirname "$0")/.." && pwd)
# shellcheck source=scripts/trees.sh
. "$here/scripts/trees.sh"
"$here/scripts/setup.sh"
run_ctest "${VANTISH_BUILD_DIR:-$here/build}" "$@"
