#!/bin/bash
# What the tests run of the libraries and the tools, in lines and branches. The test programs are the
# ordinary ones; only the libraries that they load, and the tools that the scripts start, count what
# is run.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

root=$(cd "$(dirname "$0")/.." && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$root/tests/support/shell_test.sh"

readonly COVERED=$BUILD_DIR/covered
readonly SCRIPTS_AT_ONCE=2
readonly LEAST_LINES=99
readonly LEAST_BRANCHES=94
readonly LEAST_LINES_OF_TOOLS=95

build() {
  BUILD_DIR=$COVERED JOBS=1 "$root/scripts/build" --preset=coverage >"$BUILD_DIR/covered.log" 2>&1 ||
    { tail -50 "$BUILD_DIR/covered.log"; return 1; }
  find "$COVERED" -name '*.gcda' -delete
}

# A tenth of what takes long by its number finds the same lines. Left out is what kills or
# measures, which finds no others. Some are run by users who may not write what is counted.
run_tests() {
  local log=$COVERED/tests.log
  local -a names
  mapfile -t names <<<"$(awk '$1 == "gtest" && $2 !~ /^(zelosched_.*|(load|killed|json_cost)_test)$/ { print $2 }' "$BUILD_DIR/test-programs")"
  TEST_RESULTS=$COVERED/test-results PROGRAMS_AT_ONCE=1 ZELO_SOAK_FACTOR=0.1 GCOV_ERROR_FILE=/dev/null \
    LD_LIBRARY_PATH=$COVERED/lib "$root/scripts/run-tests" "${names[@]}" >"$log" 2>&1 ||
    { sed -n '/^FAILED/,/^ok/p' "$log"; tail -1 "$log"; return 1; }
}

run_script() {
  local log=$COVERED/$1.log
  BUILD_DIR=$COVERED "$root/scripts/sandbox" "$root/tests/$1.sh" >"$log" 2>&1 </dev/null ||
    { grep -v '^ok' "$log"; return 1; }
}

# Scripts find the tools and what they preload in the build directory. Half of their time they wait.
run_scripts() {
  local name running=0 bad=0
  local -a names
  mapfile -t names <<<"$(awk '$1 == "script" && $2 ~ /^zelosched_/ && $2 !~ /night/ { print $2 }' "$BUILD_DIR/test-programs")"
  mkdir -p "$COVERED/tests"
  ln -sf "$BUILD_DIR"/tests/*.so "$COVERED/tests"
  for name in "${names[@]}"; do
    if ((running == SCRIPTS_AT_ONCE)); then
      wait -n || bad=1
      running=$((running - 1))
    fi
    run_script "$name" &
    running=$((running + 1))
  done
  for ((; running > 0; running--)); do wait -n || bad=1; done
  return "$bad"
}

# covers_enough LEAST-LINES LEAST-BRANCHES DIRECTORY...
covers_enough() {
  local lines=$1 branches=$2 status=0
  shift 2
  local report=$COVERED/coverage_of_$1.txt
  gcovr --root "$root" --exclude-throw-branches --exclude-unreachable-branches \
    "${@/#/--filter=$root/}" --fail-under-line "$lines" --fail-under-branch "$branches" \
    --print-summary "$COVERED" >"$report" 2>"$COVERED/coverage.err" || status=$?
  sed 's/^/    /' "$report" "$COVERED/coverage.err"
  grep -E '^(lines|branches): ' "$report" | sed "s/^/# $1: /"
  return "$status"
}

check "libraries and tools are built to count what is run" build
check "all tests pass with them" run_tests
check "the scripts that start the tools pass too" run_scripts
check "lines and branches of the libraries are covered" \
  covers_enough "$LEAST_LINES" "$LEAST_BRANCHES" libzeloscheduler schedule platform
check "lines of the tools are covered" covers_enough "$LEAST_LINES_OF_TOOLS" 0 tools
finish
