#!/usr/bin/env bash
# The test suite under sanitizers:
#   address  every test, built with AddressSanitizer and UndefinedBehaviorSanitizer (build-asan/)
#   thread   the concurrency tests, built with ThreadSanitizer (build-tsan/)
# Usage: scripts/sanitize.sh [address] [thread]   (both when none is named)
# Any sanitizer report fails the test that triggered it, and so the script.
set -euo pipefail
here=$(cd "$(dirname "$0")/.." && pwd)
jobs=$(nproc)

# Tests that exercise threads: the work queues, publication of the per-chip
# database, reference counting of the instance and of CF values, queued
# calibration work (retries, asynchronous cache writes, rebuilds), plus every
# test labelled "stress". Death tests fork, which ThreadSanitizer does not
# support in a process that has started threads.
tsan_tests='Dispatch|Publication|ReferenceCount|CFLifetime|QVTStore|BringUp|CachedDB|ClientProperties|Calibration\.|Database\.'
tsan_targets=(Vantish test_platform test_plugin test_lightdb test_calibration test_sysconfig)

# Reports carry whole stacks and stop the process at the first finding.
export ASAN_OPTIONS=${ASAN_OPTIONS:-detect_leaks=1:abort_on_error=1:strict_string_checks=1}
export UBSAN_OPTIONS=${UBSAN_OPTIONS:-print_stacktrace=1:halt_on_error=1}
export TSAN_OPTIONS=${TSAN_OPTIONS:-halt_on_error=1:second_deadlock_stack=1}
# OpenBLAS runs its own worker threads, built without ThreadSanitizer, which
# then reports their internal handshakes. Our code calls it from one thread at
# a time per computation, so one BLAS thread loses nothing.
export OPENBLAS_NUM_THREADS=1

section() { printf '\n==== %s ====\n' "$*"; }

build() { # folder sanitizer [targets...]
    local folder=$1 sanitizer=$2
    shift 2
    VANTISH_BUILD_DIR="$here/$folder" VANTISH_BUILD_TYPE=RelWithDebInfo \
        VANTISH_CMAKE_ARGS="-DVANTISH_SANITIZE=$sanitizer -DVANTISH_BENCH=OFF -DVANTISH_FUZZ=OFF" \
        VANTISH_BUILD_TARGETS="$*" "$here/scripts/setup.sh"
}

run_address() {
    section "AddressSanitizer + UndefinedBehaviorSanitizer: build (build-asan)"
    local start=$SECONDS
    build build-asan address
    echo "built in $((SECONDS - start)) s"
    section "AddressSanitizer + UndefinedBehaviorSanitizer: every test"
    start=$SECONDS
    (cd "$here/build-asan" && ctest --output-on-failure -j"$jobs")
    echo "tests ran in $((SECONDS - start)) s"
}

run_thread() {
    section "ThreadSanitizer: build (build-tsan)"
    local start=$SECONDS
    local targets=("${tsan_targets[@]}")
    # The stress tests, once their folder is part of the build.
    grep -q 'vantish_test_folder(stress' "$here/tests/CMakeLists.txt" && targets+=(test_stress)
    build build-tsan thread "${targets[@]}"
    echo "built in $((SECONDS - start)) s"
    section "ThreadSanitizer: concurrency tests"
    start=$SECONDS
    (cd "$here/build-tsan" &&
        ctest --output-on-failure -j"$jobs" -R "$tsan_tests" -E 'DeathTest|NOT_BUILT' --no-tests=error &&
        ctest --output-on-failure -j"$jobs" -L stress -E 'DeathTest|NOT_BUILT' --no-tests=ignore)
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
