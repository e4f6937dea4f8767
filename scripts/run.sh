#!/usr/bin/env bash
# Main job: set up, build, and run the vantish command (its demo by default).
set -euo pipefail
here=$(cd "$(dirname "$0")/.." && pwd)
"$here/scripts/setup.sh"
build=${VANTISH_BUILD_DIR:-$here/build}
exec "$build/host/vantish" "$@"
