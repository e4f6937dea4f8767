#!/usr/bin/env bash
# The test suite under sanitizers, built with clang at -O1 (scripts/trees.sh):
#   address  every test, built with AddressSanitizer and UndefinedBehaviorSanitizer
#            (build-asan/, the folder that also builds the fuzz targets)
#   thread   the tests of the code that runs on several threads, with the stress and fault
#            tests, built with ThreadSanitizer (build-tsan/)
# Usage: scripts/sanitize.sh [address] [thread]   (both when none is named)
# Any sanitizer report fails the test that triggered it, and so the script.
set -euo pipefail
here=$(cd "$(dirname "$0")/.." && pwd)
# shellcheck source=scripts/trees.sh
. "$here/scripts/trees.sh"

# The ThreadSanitizer run: every test of the programs whose code runs on more
# than one thread (the work queues, publication of the per-chip database,
# reference counting of the instance and of CF values, calibration queued at
# open, store retries, cache writes and client rebuilds), with the stress and
# fault tests. Death tests are left out: they fork, which ThreadSanitizer does
# not support in a process that has started threads.
tsan_folders=(platform plugin lightdb calibration sysconfig stress faults)

# Reports carry whole stacks and stop the process at the first finding.
export ASAN_OPTIONS=${ASAN_OPTIONS:-detect_leaks=1:abort_on_error=1:strict_string_checks=1}
export UBSAN_OPTIONS=${UBSAN_OPTIONS:-print_stacktrace=1:halt_on_error=1}
export TSAN_OPTIONS=${TSAN_OPTIONS:-halt_on_error=1:second_deadlock_stack=1}
# OpenBLAS runs its own worker threads, built without ThreadSanitizer, which
# then reports their internal handshakes. Our code calls it from one thread at
# a time per computation, so one BLAS thread loses nothing.
export OPENBLAS_NUM_THREADS=1
# The stress test at full size (about 100 000 filtered events, 70 rebuilds,
# 48 instance lifetimes); the ordinary test run uses a small share of it.
export VANTISH_STRESS_SCALE=${VANTISH_STRESS_SCALE:-1}

section() { printf '\n==== %s ====\n' "$*"; }

run_address() {
    section "AddressSanitizer + UndefinedBehaviorSanitizer: build (build-asan)"
    local start=$SECONDS
    sanitizer_build build-asan address
    echo "built in $((SECONDS - start)) s"
    section "AddressSanitizer + UndefinedBehaviorSanitizer: every test"
    start=$SECONDS
    run_ctest "$here/build-asan"
    echo "tests ran in $((SECONDS - start)) s"
}

run_thread() {
    section "ThreadSanitizer: build (build-tsan)"
    local start=$SECONDS
    local targets=(Vantish) labels=() folder
    for folder in "${tsan_folders[@]}"; do
        # A folder takes part once the test build knows it.
        grep -q "vantish_test_folder($folder" "$here/tests/CMakeLists.txt" || continue
        targets+=("test_$folder")
        labels+=("$folder")
    done
    sanitizer_build build-tsan thread "${targets[@]}"
    echo "built in $((SECONDS - start)) s"
    section "ThreadSanitizer: tests of ${labels[*]}"
    start=$SECONDS
    local pattern
    pattern="^($(IFS='|'; echo "${labels[*]}"))\$"
    run_ctest "$here/build-tsan" -L "$pattern" -E 'DeathTest|NOT_BUILT' --no-tests=error
    echo "tests ran in $((SECONDS - start)) s"
}

kinds=("$@")
[ ${#kinds[@]} -eq 0 ] && kinds=(address thread)
for kind in "${kinds[@]}"; do
    case $kind in
    address) run_address ;;
    thread) run_thread ;;
    *) echo "sanitize.sh: unknown sanitizer '$kind' (address or thread)" >&2; exit 2 ;;
    esac
done
