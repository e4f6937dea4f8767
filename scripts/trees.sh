# Sourced by the scripts that build and test: the sanitizer build folders and
# the CTest run they share.
#
#   build-asan/  clang, AddressSanitizer + UndefinedBehaviorSanitizer, the
#                fuzz targets with libFuzzer's coverage in what they reach:
#                every test runs here (scripts/sanitize.sh address) and every
#                fuzz target (scripts/fuzz.sh)
#   build-tsan/  clang, ThreadSanitizer: the tests of the code that runs on
#                several threads (scripts/sanitize.sh thread)
# Both are CMAKE_BUILD_TYPE=Sanitize (-O1, line tables, VANTISH_ASSERT on).

# Configures and builds a sanitizer folder with clang: sanitizer_build FOLDER
# SANITIZER [TARGET...]. A folder configured before with another compiler is
# made again.
sanitizer_build() {
    local folder=$here/$1 sanitizer=$2 args
    shift 2
    if [ -f "$folder/CMakeCache.txt" ] && ! grep -q '^CMAKE_CXX_COMPILER:[A-Z]*=.*clang++' "$folder/CMakeCache.txt"; then
        echo "$folder was configured with another compiler; making it again with clang" >&2
        rm -rf "$folder"
    fi
    case $sanitizer in
    address) args="-DVANTISH_SANITIZE=address -DVANTISH_FUZZ=ON -DVANTISH_BENCH=OFF" ;;
    thread) args="-DVANTISH_SANITIZE=thread -DVANTISH_FUZZ=OFF -DVANTISH_BENCH=OFF" ;;
    esac
    CC=clang CXX=clang++ VANTISH_BUILD_DIR=$folder VANTISH_BUILD_TYPE=Sanitize VANTISH_CMAKE_ARGS=$args \
        VANTISH_BUILD_TARGETS="$*" "$here/scripts/setup.sh"
}

# Runs CTest in a build folder: run_ctest FOLDER [CTEST ARGUMENTS...]. With
# VANTISH_NO_SKIPS=1 (CI) a test that was skipped or did not run fails the run
# as well: CI runs every test.
run_ctest() {
    local folder=$1 log status=0
    shift
    log=$(mktemp)
    (cd "$folder" && ctest --output-on-failure -j"$(nproc)" "$@") 2>&1 | tee "$log" || status=$?
    if [ "${VANTISH_NO_SKIPS:-0}" = 1 ] && grep -Eq '\((Skipped|Not Run|Disabled)\)$' "$log"; then
        echo "ctest: tests were skipped or did not run (VANTISH_NO_SKIPS=1):" >&2
        grep -E '\((Skipped|Not Run|Disabled)\)$' "$log" >&2
        status=1
    fi
    rm -f "$log"
    return $status
}
