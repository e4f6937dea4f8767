#!/usr/bin/env bash
# Formats every C++ file of the project with its .clang-format (clang-format 14).
#   scripts/format.sh           rewrites the files in place
#   scripts/format.sh --check   changes nothing; lists the files that differ and fails
set -euo pipefail
here=$(cd "$(dirname "$0")/.." && pwd)
cd "$here"
formatter=${CLANG_FORMAT:-clang-format}
command -v "$formatter" >/dev/null || { echo "format: $formatter is not installed (Debian: clang-format)" >&2; exit 2; }

mapfile -t files < <(git ls-files '*.cpp' '*.h')
if [ "${1:-}" = "--check" ]; then
    differ=()
    for file in "${files[@]}"; do
        if ! "$formatter" --style=file "$file" | cmp -s - "$file"; then
            differ+=("$file")
        fi
    done
    if [ ${#differ[@]} -gt 0 ]; then
        printf 'format: not formatted: %s\n' "${differ[@]}" >&2
        echo "format: run scripts/format.sh and commit the result" >&2
        exit 1
    fi
    echo "format: ${#files[@]} files formatted as .clang-format says"
else
    "$formatter" --style=file -i "${files[@]}"
fi
