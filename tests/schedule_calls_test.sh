#!/bin/bash
# The library of schedules calls nothing that reads a clock, allocates, logs or makes a system call.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"

# String and memory functions, and those that the compiler's protections add.
readonly ALLOWED='^(mem(cpy|set|move|cmp)|str(len|nlen|cpy)|stpcpy|__(st[pr]cpy|mem(cpy|set))_chk|__stack_chk_fail|_GLOBAL_OFFSET_TABLE_)$'

foreign_calls() {
  nm -u -C "$BUILD_DIR/schedule/libschedule.a" | awk '$1 == "U" { $1 = ""; print substr($0, 2) }' |
    sort -u | grep -vE "$ALLOWED" | grep -vE '^Sched|^sched' || true
}

calls_nothing_else() {
  local calls
  calls=$(foreign_calls)
  if [[ -n $calls ]]; then
    echo "$calls"
    return 1
  fi
}

if nm "$BUILD_DIR/schedule/libschedule.a" | grep -qE '__(asan|ubsan|gcov)_'; then
  skip "the rules of schedules call nothing of the system" "this build watches each call"
else
  check "the rules of schedules call nothing of the system" calls_nothing_else
fi
finish
