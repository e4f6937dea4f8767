#!/usr/bin/env bash
# What `vantish` prints for every sample unit, as a regression check for
# changes that must not change behaviour: `vantish open` from an empty state
# folder (first start, the per-chip database is built) and again (second
# start, it comes from the cache), and `vantish eval`.
#
# Usage: scripts/transcripts.sh record   writes tests/transcripts/<unit>.txt
#        scripts/transcripts.sh check    compares with them (exit 1 on a difference)
# The build must exist (scripts/setup.sh); VANTISH_BUILD_DIR names another one.
#
# Machine paths are blanked. `open` holds the bring-up it queues until the
# plug-in's open has returned, so each log line stands under the step that
# logged it and the text is the same on every run.
set -euo pipefail
here=$(cd "$(dirname "$0")/.." && pwd)
build=${VANTISH_BUILD_DIR:-$here/build}
vantish=$build/host/vantish
expected=$here/tests/transcripts
mode=${1:-check}

case $mode in
record | check) ;;
*) echo "usage: scripts/transcripts.sh record|check" >&2; exit 2 ;;
esac

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
export OPENBLAS_NUM_THREADS=1

transcript() { # unit
    local unit=$1 device=$here/data/devices/$1/device.json state=$work/state-$1
    echo "#### open, first start"
    "$vantish" --state "$state" open "$device" 2>&1 || echo "(exit $?)"
    echo "#### open, second start"
    "$vantish" --state "$state" open "$device" 2>&1 || echo "(exit $?)"
    echo "#### eval"
    "$vantish" --state "$work/eval-$unit" eval "$device" 2>&1 || echo "(exit $?)"
}

blank() {
    sed -e "s#$build#<build>#g" -e "s#$work#<work>#g" -e "s#$here#<source>#g"
}

status=0
mkdir -p "$expected" "$work/out"
for folder in "$here"/data/devices/*/; do
    unit=$(basename "$folder")
    transcript "$unit" | blank >"$work/out/$unit.txt"
    if [ "$mode" = record ]; then
        cp "$work/out/$unit.txt" "$expected/$unit.txt"
        echo "transcripts: recorded $unit"
    elif ! diff -u "$expected/$unit.txt" "$work/out/$unit.txt"; then
        echo "transcripts: $unit differs" >&2
        status=1
    else
        echo "transcripts: $unit unchanged"
    fi
done
exit $status
