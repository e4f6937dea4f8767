#!/usr/bin/env bash
# Checks that every library folder includes only the folders below it, so the
# dependency graph of docs/architecture.md holds and has no cycle. Reads the
# project's own `#include "folder/..."` lines; exits 1 and names each include
# that reaches a folder its library may not use.
#
# Usage: scripts/check_layers.sh        (from anywhere; CI and the test suite run it)
set -euo pipefail
here=$(cd "$(dirname "$0")/.." && pwd)
cd "$here"

# What each library may include besides itself, lowest layer first. A folder
# not named here (tests/, fuzz/, bench/, tools/) may include anything.
declare -A allowed=(
    [platform]=""
    [support]="platform"
    [formats]="support platform"
    [lightdb]="support platform"
    [colour]="lightdb support platform"
    [calibration]="colour lightdb formats support platform"
    [sysconfig]="calibration colour lightdb formats support platform"
    [plugin]="sysconfig calibration colour lightdb formats support platform"
    [spectra]=""
    [host/recordcodec]="formats support platform"
    [host/emulator]="formats support platform"
    [host/inputs]="host/recordcodec host/emulator spectra formats support platform"
    [host/evaluation]="host/inputs host/recordcodec host/emulator spectra formats support platform"
    [host/vantish]="host/evaluation host/inputs host/emulator host/recordcodec lightdb spectra formats support platform"
)
order=(platform support formats lightdb colour calibration sysconfig plugin spectra
       host/recordcodec host/emulator host/inputs host/evaluation host/vantish)

status=0
for library in "${order[@]}"; do
    [ -d "$library" ] || continue
    permitted=" $library ${allowed[$library]} "
    while IFS= read -r line; do
        file=${line%%:*}
        target=$(sed -E 's/.*#include "([^"]+)".*/\1/' <<<"${line#*:}")
        folder=${target%/*}
        [ "$folder" = "$target" ] && continue # a header beside the file
        # The deepest listed library the included header belongs to.
        owner=
        for candidate in "${order[@]}"; do
            case $folder/ in "$candidate"/*) owner=$candidate ;; esac
        done
        [ -z "$owner" ] && continue # not one of the project's libraries
        case $permitted in
        *" $owner "*) ;;
        *)
            echo "check_layers: $file includes \"$target\": $library may not depend on $owner" >&2
            status=1
            ;;
        esac
    done < <(grep -rHE '^\s*#\s*include\s+"' --include='*.cpp' --include='*.h' "$library" || true)
done

if [ $status -eq 0 ]; then
    echo "check_layers: every library includes only the layers below it"
fi
exit $status
