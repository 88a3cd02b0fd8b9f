#!/bin/bash
# The whole way once, with nothing faked: a task is saved, Debian's cron daemon starts it in its
# minute, it runs with its owner's ids, and the run is recorded. Waits for a real minute.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"
# shellcheck source=tests/support/start_cron.sh
. "$here/support/start_cron.sh"

readonly OWNER=65534
readonly OUTPUT=/tmp/real_cron_test.ids
readonly LOG=/tmp/real_cron_test.log
readonly PATIENCE=90

run_is_over() {
  [[ -n $(sqlite3 /tmp/sched_status.sqlite \
    'SELECT 1 FROM task_status WHERE status_code > 2' 2>/dev/null) ]]
}

wait_for_run() {
  local second
  for ((second = 0; second < PATIENCE; second++)); do
    if run_is_over; then return 0; fi
    sleep 1
  done
  echo "no run was recorded in $PATIENCE seconds; cron's log:"
  cat "$LOG"
  return 1
}

no_line_of_the_log_says() {
  ! grep -iE "$1" "$LOG"
}

rows() {
  sqlite3 -separator ' ' /tmp/sched_status.sqlite \
    "SELECT task_id, status_code, ifnull(comment, '') FROM task_status"
}

if ! grep -qE '^ *0 +0 +[0-9]{2,}' /proc/self/uid_map; then
  skip "cron runs a task with its owner's ids" "this sandbox has no user but 0"
  finish
fi

group=$(id -g "$OWNER")
groups=$(id -G "$OWNER")
install -m 0755 "$BUILD_DIR/bin/zeloschedtask" /tmp/zeloschedtask
check "cron starts" start_cron "$LOG"
check "tasks are saved" "$BUILD_DIR/tests/demo_tasks" "$OWNER" "$OUTPUT"
check "the two enabled tasks are in the crontab" \
  same "$(grep -o '/tmp/zeloschedtask.*' /etc/crontab | sort)" \
  "$(printf '/tmp/zeloschedtask --run id=%d\n' 1 3)"
check "cron runs the task that is due" wait_for_run
check "that run alone is recorded, as finished" same "$(rows)" "1 3 "
check "it ran with its owner's ids and groups only" \
  same "$(cat "$OUTPUT")" "$OWNER $OWNER $group $group $groups"
check "cron started the program" grep -q 'root) CMD (/tmp/zeloschedtask --run id=1)' "$LOG"
check "cron found no error in the crontab" no_line_of_the_log_says 'error|bad|wrong|fail'
finish
