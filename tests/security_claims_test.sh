#!/bin/bash
# Each claim of SECURITY.md names the tests that show it. A test that is renamed or taken away takes
# its claim along.
#
# Functions are called by check, and backquotes are looked for:
# shellcheck disable=SC2317,SC2016
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"
cd "$here/.."

exists() {
  local suite=${1%.*} name=${1#*.}
  grep -qE "^TEST(_F|_P)?\($suite, $name\)" tests/*.cpp
}

tests=$(grep -oE '`[A-Z][A-Za-z]+\.[A-Z][A-Za-z0-9]+`' SECURITY.md | tr -d '`' | sort -u)
files=$(grep -oE '`(tests|fuzz|debian)/[a-z_.]+`' SECURITY.md | tr -d '`' | sort -u)
check "claims name tests" test "$(wc -l <<<"$tests")" -ge 20
for name in $tests; do
  check "$name is there" exists "$name"
done
for file in $files; do
  check "$file is there" test -e "$file"
done
finish
