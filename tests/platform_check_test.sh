#!/bin/bash
# examples/platform_check.c: it finds no fault in our platform, and in one that breaks a contract it names
# that one, whichever it is.
#
# Functions are called by check, and what is in single quotes is for another shell:
# shellcheck disable=SC2016,SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"

readonly CHECK=$BUILD_DIR/tests/platform_check
readonly WRONG=$BUILD_DIR/tests/wrong_platform.so
readonly WORK=$BUILD_DIR/platform_check_test
readonly AT_ONCE=8 # most wait for a second
sandbox=$(cd "$here/.." && pwd -P)/scripts/sandbox
mkdir -p "$WORK"

finds_no_fault() {
  "$sandbox" "$CHECK" "$@" >"$WORK/own" && ! grep -v '^ok ' "$WORK/own"
}

# A line of the wrong platform's contracts that are not named as faults.
unnamed_faults() {
  sed 's/^ok //' "$WORK/own" | tr '\n' '\0' | xargs -0 -P "$AT_ONCE" -I FAULT bash -c '
    "$1" env LD_PRELOAD="$2" WRONG_PLATFORM="$4" "$3" --system 2>&1 | grep -qF "not ok $4" || echo "$4"' \
    bash "$sandbox" "$WRONG" "$CHECK" FAULT
}

changes_nothing() {
  same "$("$sandbox" bash -c 'before=$(cksum /etc/crontab; ls -R /usr/zelo /tmp)
    "$0" >/dev/null; test "$before" = "$(cksum /etc/crontab; ls -R /usr/zelo /tmp)" && echo same' \
    "$CHECK")" same
}

puts_back() {
  same "$("$sandbox" bash -c '
    printf "[poweron]\ntimes=\"1 127 7 30\"\n[poweroff]\ntimes=\"\"\n" >/usr/zelo/etc/power_sched.conf
    "$0" --system >/dev/null; cksum </etc/crontab; grep times /usr/zelo/etc/power_sched.conf; ls /usr/zelo /tmp' "$CHECK")" \
    "$("$sandbox" bash -c 'cksum </etc/crontab'; printf 'times="1 127 7 30"\ntimes=""\n'; "$sandbox" bash -c 'ls /usr/zelo /tmp')"
}

wrong_call_is_refused() {
  local status=0
  "$CHECK" --sistem >/dev/null 2>&1 || status=$?
  same "$status" 2
}

check "our platform keeps every contract that needs no system of its own" finds_no_fault
check "nothing is changed by these" changes_nothing
check "and all others" finds_no_fault --system
check "there are a hundred of them" test "$(wc -l <"$WORK/own")" -ge 100
check "every fault is named" same "$(unnamed_faults)" ""
check "what a machine has once is put back" puts_back
check "a wrong call is refused" wrong_call_is_refused
finish
