#!/bin/bash
# The benchmarks still run and print every row. No time is judged.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"

readonly BENCH=$here/../scripts/bench
readonly AMOUNT='[0-9.e+]+ (ns|us|ms|B|KiB|MiB)'
readonly ROW="^.+ $AMOUNT  .+ $AMOUNT +[0-9.]+ +[0-9.]+  (yes|no)\$"

# prints_rows NAME COUNT: under a line of headings
prints_rows() {
  local table
  table=$("$BENCH" --built --brief "$1") || return 1
  same "$(grep -cE "$ROW" <<<"$table")" "$2" && same "$(wc -l <<<"$table")" $(($2 + 1)) &&
    [[ $table == "what "*"at most"* ]]
}

# run_bench PROGRAM ARGUMENTS: out, err and status are what came of it
run_bench() {
  status=0
  out=$("$here/../scripts/sandbox" "$BUILD_DIR/bench/${1}_bench" "${@:2}" 2>"$BUILD_DIR/bench_test.err") || status=$?
  err=$(<"$BUILD_DIR/bench_test.err")
  rm "$BUILD_DIR/bench_test.err"
}

lists_benchmarks() {
  run_bench list --benchmark_list_tests=true
  same "$status" 0 && [[ $out == *"ZELOSchedTaskListGet, 10 tasks"* ]]
}

refuses_half_a_row() {
  run_bench list '--benchmark_filter=GKeyFile.* 10 tasks'
  same "$status" 1 && [[ $err == *"no row has both its sides in the filter" ]]
}

refuses_to_run_outside_the_sandbox() {
  local complaint
  ! complaint=$(env -u ZELO_SANDBOX "$BUILD_DIR/bench/json_bench" 2>&1) &&
    [[ $complaint == *"being in the sandbox (scripts/sandbox) failed" ]]
}

explains_itself() {
  [[ $("$BENCH" --help) == *"scripts/bench --brief"* ]]
}

names_what_there_is() {
  local complaint status=0
  complaint=$("$BENCH" lists 2>&1) || status=$?
  same "$status" 2 && [[ $complaint == *"no 'lists'"*"list get create"* ]]
}

check "listing is compared with GKeyFile" prints_rows list 5
check "reading one task is compared with reading the file" prints_rows get 3
check "creating is compared with the copies and the crontab" prints_rows create 3
check "the next trigger time is compared with the clock's calls" prints_rows trigger 10
check "JSON is compared with JsonCpp alone" prints_rows json 3
check "recording a run is compared with the statements alone" prints_rows status 1
check "a run is compared with a shell that is forked" prints_rows run 4
check "commands are compared with the library's list" prints_rows command 5
check "a list's memory is compared with its records and file" prints_rows memory 4
check "the benchmarks of a program are listed" lists_benchmarks
check "a filter that leaves no row whole is refused" refuses_half_a_row
check "a benchmark refuses to run outside the sandbox" refuses_to_run_outside_the_sandbox
check "scripts/bench --help says how it is called" explains_itself
check "an unknown name is refused, and those there are are named" names_what_there_is
finish
