#!/bin/bash
# The tests once more, against a build that the address and the undefined-behaviour sanitizer watch.
# Left out are the tests of what is built and installed, for that is never built like this; and, but in
# the long form (ZELO_SOAK_FACTOR=1), the scripts that start hundreds of programs, and what measures or
# kills, which no sanitizer can find more about than the tests of the same steps.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

root=$(cd "$(dirname "$0")/.." && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$root/tests/support/shell_test.sh"

readonly SANITIZED=$BUILD_DIR/sanitized
readonly SCRIPTS=(json_python_test poweroff_feasible_check_test power_crontab_cron_test
  zelosched_boot_test zelosched_cli_test zelosched_terminal_test)

readonly MEASURING=(json_cost_test killed_test load_test)

# clang takes half of gcc's time where it watches. Optimising would cost more time than it saves.
if command -v clang++ >/dev/null; then export CC=clang CXX=clang++; fi
build() {
  BUILD_DIR=$SANITIZED JOBS=1 "$root/scripts/build" --preset=asan "${names[@]}" \
    >"$BUILD_DIR/sanitized.log" 2>&1 ||
    { tail -50 "$BUILD_DIR/sanitized.log"; return 1; }
}

# Daemons that scripts/deps has unpacked.
lend_daemons() {
  local daemon
  for daemon in cron openssh-server prometheus-node-exporter; do
    if [[ -e $BUILD_DIR/$daemon ]]; then ln -sfn "$BUILD_DIR/$daemon" "$SANITIZED/$daemon"; fi
  done
}

programs() {
  awk '$1 == "gtest" { print $2 }' "$BUILD_DIR/test-programs" |
    if [[ -n ${ZELO_SOAK_FACTOR:-} ]]; then cat; else grep -vxF "$(printf '%s\n' "${MEASURING[@]}")"; fi
  if [[ -n ${ZELO_SOAK_FACTOR:-} ]]; then printf '%s\n' "${SCRIPTS[@]}"; fi
}

# A tenth of what takes long by its number. The libraries that some tests preload come before the
# sanitizers' own.
run_tests() {
  local log=$SANITIZED/tests.log
  lend_daemons
  BUILD_DIR=$SANITIZED TEST_RESULTS=$SANITIZED/test-results PROGRAMS_AT_ONCE=1 \
    ZELO_SOAK_FACTOR=${ZELO_SOAK_FACTOR:-0.1} UBSAN_OPTIONS=print_stacktrace=1 \
    ASAN_OPTIONS=verify_asan_link_order=0:detect_stack_use_after_return=1 \
    "$root/scripts/run-tests" "${names[@]}" >"$log" 2>&1 ||
    { sed -n '/^FAILED/,/^ok/p' "$log"; tail -1 "$log"; return 1; }
  echo "    $(tail -1 "$log")"
}

mapfile -t names <<<"$(programs)"
check "the product is built with sanitizers" build
check "all tests pass, and no sanitizer objects" run_tests
finish
