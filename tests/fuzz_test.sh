#!/bin/bash
# What the fuzzers found once stays found, and each tries for another three seconds.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"

readonly SECONDS_EACH=3
readonly CORPUS=$here/../fuzz/corpus

replay() {
  "$here/../scripts/sandbox" "$BUILD_DIR/fuzz/fuzz_$1" "$CORPUS/$1"/*
}

for directory in "$CORPUS"/*/; do
  target=$(basename "$directory")
  check "the corpus of $target is read" replay "$target"
done

if ! command -v clang++ >/dev/null; then
  skip "each target is fuzzed" "needs clang"
  finish
fi
export FUZZ_AT_ONCE=1 # other tests run beside this one
export BUILD_DIR=$BUILD_DIR/fuzzers
"$here/../scripts/fuzz" "$SECONDS_EACH" >/tmp/fuzz_test.$$ 2>&1 || tests_failed=1
if ((tests_failed)); then cat /tmp/fuzz_test.$$; else grep '^ok - ' /tmp/fuzz_test.$$; fi
rm /tmp/fuzz_test.$$
finish
