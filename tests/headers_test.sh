#!/bin/bash
# The public headers: they go together in any order, declare what the library exports and nothing
# else, and say of each function what a caller must know.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"

readonly HEADERS=$here/../libzeloscheduler/include
readonly FORWARD='#include <zelosched.h>
#include <zeloschedsetter.h>
#include <zeloschedgetter.h>
'
readonly BACKWARD='#include <zeloschedgetter.h>
#include <zeloschedsetter.h>
#include <zelosched.h>
'
export LC_ALL=C

compiles() {
  local text=$1
  shift
  "$@" -Wall -Wextra -Wundef -pedantic -Werror -I "$HEADERS" -fsyntax-only - <<<"$text"
}

declared_functions() {
  gcc -std=c11 -E -P -I "$HEADERS" - <<<"$FORWARD" | grep -oE '\b(ZELOSched\w+|zelo\w+_init) ?\(' |
    tr -d ' (' | sort
}

exported_functions() {
  grep -vE '^(SchedBackends|cBackend|pfLock)@' "$here/exported_names.txt" | sed 's/@.*//' | sort
}

# A comment holds for the declarations below it, up to the next blank line.
uncommented_declarations() {
  awk '/^$/ { commented = 0 }
       /\*\/$/ { commented = 1 }
       /^(extern )?ZELO_SCHED_(API|[A-Z_]+\(ZELO)/ && !commented { print FILENAME ": " $0 }' \
    "$HEADERS"/*.h
}

# A number of the record's layout that a caller in another language relies on.
record_size() {
  local program=/tmp/headers_test
  gcc -std=c11 -I "$HEADERS" -x c - -o "$program" <<<'#include <stdio.h>
#include <zelosched.h>
int main(void) { printf("%zu %zu\n", sizeof(ZELO_SCHED_TASK), offsetof(ZELO_SCHED_TASK, Command)); }'
  "$program"
}

for standard in c11 c17; do
  check "the headers go together as $standard, twice and in any order" \
    compiles "$FORWARD$BACKWARD$FORWARD" gcc -Wstrict-prototypes -std=$standard -x c
  check "the accessors may come first as $standard" \
    compiles "$BACKWARD" gcc -Wstrict-prototypes -std=$standard -x c
done
for standard in c++17 c++20; do
  check "the headers go together as $standard, twice and in any order" \
    compiles "$BACKWARD$FORWARD" g++ -std=$standard -x c++
done
check "what is declared is what is exported" same "$(declared_functions)" "$(exported_functions)"
check "every declaration has a comment" same "$(uncommented_declarations)" ""
check "the record is laid out without packing" same "$(record_size)" "34920 18532"
finish
