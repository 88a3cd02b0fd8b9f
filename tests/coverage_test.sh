#!/bin/bash
# What the tests run of the libraries, in lines and branches. The test programs are the ordinary
# ones; only the libraries that they load count what is run.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

root=$(cd "$(dirname "$0")/.." && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$root/tests/support/shell_test.sh"

readonly COVERED=$BUILD_DIR/covered
readonly LEAST_LINES=99
readonly LEAST_BRANCHES=94

build() {
  BUILD_DIR=$COVERED JOBS=1 "$root/scripts/build" --preset=coverage >"$BUILD_DIR/covered.log" 2>&1 ||
    { tail -50 "$BUILD_DIR/covered.log"; return 1; }
  find "$COVERED" -name '*.gcda' -delete
}

# A tenth of what takes long by its number finds the same lines, and many at once find no others.
# Some are run by users who may not write what is counted.
run_tests() {
  local log=$COVERED/tests.log
  local -a names
  mapfile -t names <<<"$(awk '$1 == "gtest" && $2 !~ /^(zelosched_.*|load_test)$/ { print $2 }' "$BUILD_DIR/test-programs")"
  TEST_RESULTS=$COVERED/test-results PROGRAMS_AT_ONCE=1 ZELO_SOAK_FACTOR=0.1 GCOV_ERROR_FILE=/dev/null \
    LD_LIBRARY_PATH=$COVERED/lib "$root/scripts/run-tests" "${names[@]}" >"$log" 2>&1 ||
    { sed -n '/^FAILED/,/^ok/p' "$log"; tail -1 "$log"; return 1; }
}

covers_enough() {
  local status=0
  gcovr --root "$root" --exclude-throw-branches --exclude-unreachable-branches \
    --filter "$root/schedule/" --filter "$root/libzeloscheduler/" --filter "$root/platform/" \
    --fail-under-line "$LEAST_LINES" --fail-under-branch "$LEAST_BRANCHES" --print-summary "$COVERED" \
    >"$COVERED/coverage.txt" 2>"$COVERED/coverage.err" || status=$?
  sed 's/^/    /' "$COVERED/coverage.txt" "$COVERED/coverage.err"
  grep -E '^(lines|branches): ' "$COVERED/coverage.txt" | sed 's/^/# /'
  return "$status"
}

check "the libraries are built to count what is run" build
check "all tests pass with them" run_tests
check "lines and branches are covered" covers_enough
finish
