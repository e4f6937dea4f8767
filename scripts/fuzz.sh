#!/usr/bin/env bash
# Builds the libFuzzer targets (clang, ASan + UBSan, in build-asan/, which the
# sanitizer run of the tests shares: scripts/trees.sh) and runs each for
# SECONDS (default 25) from its seed corpus. Any finding stops the run of that
# target, leaves the input in build-asan/artifacts/ and fails the script.
#
# Usage: scripts/fuzz.sh [SECONDS] [TARGET...]      (every target when none is named)
#   FUZZ_JOBS=N    targets fuzzed at the same time (default 2)
#   FUZZ_ARGS=...  more libFuzzer flags, e.g. "-max_len=20000" or "-dict=..."
# Long runs: scripts/fuzz.sh 3600 light_databases   (an hour); the corpus grows
# in build-asan/corpus/<target>/ and is kept between runs.
set -euo pipefail
here=$(cd "$(dirname "$0")/.." && pwd)
# shellcheck source=scripts/trees.sh
. "$here/scripts/trees.sh"
seconds=${1:-25}
[ $# -gt 0 ] && shift
build=$here/build-asan
jobs=${FUZZ_JOBS:-2}

targets=("$@")
if [ ${#targets[@]} -eq 0 ]; then
    targets=(factory_layouts factory_store sysconfig_blobs sample_record client_properties light_databases
             event_input device_description)
fi

echo "fuzz: building the targets in $build"
sanitizer_build build-asan address fuzz_targets

# Seeds: the in-tree corpus (hand-made inputs and every past finding), seeds
# generated from the record layouts, and the sample devices of data/.
rm -rf "$build/seeds"
"$build/tools/fuzz_make_seeds" "$build/seeds" "$here/data"
mkdir -p "$build/artifacts"

# Findings stop the process at once; leak checks run per input.
export ASAN_OPTIONS=${ASAN_OPTIONS:-abort_on_error=1:detect_leaks=1:strict_string_checks=1}
export UBSAN_OPTIONS=${UBSAN_OPTIONS:-print_stacktrace=1:halt_on_error=1}
export OPENBLAS_NUM_THREADS=1

run_one() {
    local target=$1 log=$build/artifacts/$1.log
    mkdir -p "$build/corpus/$target" "$here/fuzz/corpus/$target" "$build/seeds/$target"
    # shellcheck disable=SC2086 # FUZZ_ARGS holds several flags
    if "$build/fuzz/fuzz_$target" "$build/corpus/$target" "$here/fuzz/corpus/$target" "$build/seeds/$target" \
        -max_total_time="$seconds" -timeout=10 -rss_limit_mb=2048 -max_len=24576 -print_final_stats=1 \
        -artifact_prefix="$build/artifacts/$target-" ${FUZZ_ARGS:-} >"$log" 2>&1; then
        printf 'fuzz: %-20s ok   %12s runs  %s\n' "$target" \
            "$(sed -n 's/^stat::number_of_executed_units: *//p' "$log")" \
            "$(grep -o 'cov: [0-9]*' "$log" | tail -1)"
    else
        printf 'fuzz: %-20s FAILED, see %s\n' "$target" "$log"
        grep -E '^(==[0-9]+==ERROR|SUMMARY|.*runtime error)' "$log" | head -5
        return 1
    fi
}

echo "fuzz: ${#targets[@]} targets, ${seconds} s each, $jobs at a time"
failed=0
pids=()
for target in "${targets[@]}"; do
    run_one "$target" &
    pids+=($!)
    if [ ${#pids[@]} -ge "$jobs" ]; then
        wait "${pids[0]}" || failed=1
        pids=("${pids[@]:1}")
    fi
done
for pid in "${pids[@]}"; do
    wait "$pid" || failed=1
done
exit $failed
