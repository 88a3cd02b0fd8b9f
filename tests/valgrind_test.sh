#!/bin/bash
# The examples in C under valgrind: no memory leak and no invalid access.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"

readonly EXAMPLES=$here/../examples BIN=/tmp/valgrind_test
readonly FOUND=99
mkdir -p "$BIN"

build() {
  local name=$1
  gcc -std=c11 -D_POSIX_C_SOURCE=200809L -g "$EXAMPLES/$name.c" \
    -I "$here/../libzeloscheduler/include" -I "$here/../platform/libzelocore/include" \
    -L "$BUILD_DIR/lib" -lzeloscheduler -lzelocore -lsqlite3 \
    -Wl,-rpath,"$BUILD_DIR/lib" -Wl,-rpath-link,"$BUILD_DIR/lib" -o "$BIN/$name"
}

# The status is the example's own unless valgrind found something.
is_clean() {
  local wanted=$1 status=0
  shift
  valgrind --quiet --error-exitcode="$FOUND" --leak-check=full --errors-for-leak-kinds=definite \
    --child-silent-after-fork=yes "$@" >"$BIN/log" 2>&1 || status=$?
  [[ $status == "$wanted" ]] || { cat "$BIN/log"; echo "status $status"; return 1; }
}

for name in save_and_list save_for_user tasks_of_owner watch_run; do
  check "$name is built" build "$name"
done
check "a task is saved and all are listed" is_clean 0 "$BIN/save_and_list" good 'exit 0'
check "and one that will fail" is_clean 0 "$BIN/save_and_list" bad 'exit 3'
check "tasks of one owner are listed" is_clean 0 "$BIN/tasks_of_owner" 0
check "a run is watched to its end" is_clean 0 "$BIN/watch_run" 1
check "and one that fails" is_clean 1 "$BIN/watch_run" 2
check "a task is saved for a user" is_clean 0 "$BIN/save_for_user" 1000 owner=1000 name=n \
  cmd=true 'run hour=1' 'run min=2'
check "and changed" is_clean 0 "$BIN/save_for_user" 1000 owner=1000 id=3 name=m
check "and refused to another one" is_clean 1 "$BIN/save_for_user" 1001 owner=1001 id=3 name=o
check "an example that is called wrongly" is_clean 2 "$BIN/watch_run"
finish
