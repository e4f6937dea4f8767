#!/usr/bin/env bash
# The help of every vantish command (`vantish --help-all`) as docs/usage.md
# shows it, between the lines "<!-- begin vantish --help-all -->" and
# "<!-- end vantish --help-all -->". The test suite (test_host) compares the two.
#
# Usage: scripts/usage_help.sh record   rewrites the block in docs/usage.md
#        scripts/usage_help.sh check    compares (exit 1 on a difference)
#        scripts/usage_help.sh print    prints the help as the block holds it
# The defaults that depend on the machine are shown as "build/Vantish.plugin"
# and "~/.local/state/vantish". VANTISH_BUILD_DIR names another build.
set -euo pipefail
here=$(cd "$(dirname "$0")/.." && pwd)
build=${VANTISH_BUILD_DIR:-$here/build}
usage=$here/docs/usage.md
begin='<!-- begin vantish --help-all -->'
end='<!-- end vantish --help-all -->'

help() { VANTISH_BUNDLE=build/Vantish.plugin XDG_STATE_HOME='~/.local/state' "$build/host/vantish" --help-all; }

block() { # the block's lines, markers included
    echo "$begin"
    echo '```text'
    help
    echo '```'
    echo "$end"
}

case ${1:-check} in
print) help ;;
record)
    grep -qxF "$begin" "$usage" || { echo "usage_help: no line '$begin' in $usage" >&2; exit 2; }
    new=$(mktemp)
    trap 'rm -f "$new"' EXIT
    awk -v begin="$begin" -v end="$end" -v blockfile=<(block) '
        $0 == begin { while ((getline line < blockfile) > 0) print line; skipping = 1; next }
        $0 == end { skipping = 0; next }
        !skipping { print }' "$usage" >"$new"
    cp "$new" "$usage"
    echo "usage_help: recorded the help in $usage"
    ;;
check)
    if ! diff -u <(sed -n "\\#^$begin\$#,\\#^$end\$#p" "$usage") <(block); then
        echo "usage_help: docs/usage.md shows another help than vantish --help-all (scripts/usage_help.sh record)" >&2
        exit 1
    fi
    echo "usage_help: docs/usage.md shows the help of vantish --help-all"
    ;;
*) echo "usage: scripts/usage_help.sh record|check|print" >&2; exit 2 ;;
esac
