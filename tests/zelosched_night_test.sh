#!/bin/bash
# With the real cron: runs that failed, hang or were missed, and the notices of them. Waits for a real
# minute.
#
# Functions are called by check, and what stands in single quotes is for another shell:
# shellcheck disable=SC2317,SC2016
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"
# shellcheck source=tests/support/start_cron.sh
. "$here/support/start_cron.sh"
# shellcheck source=tests/support/zelosched_test.sh
. "$here/support/zelosched_test.sh"

readonly LOG=/tmp/night_test.log
readonly TOLD=/run/night_test.told
readonly PATIENCE=900 # tenths of a second
readonly NOBODY_ID=65534

if ! grep -qE '^ *0 +0 +[0-9]{2,}' /proc/self/uid_map; then
  skip "the night is looked through in the morning" "this sandbox has no user but 0"
  finish
fi

# in_a_minute NAME [OPTION...] -- COMMAND: a task that is due in the minute after this one
in_a_minute() {
  local name=$1
  shift
  z add --quiet --daily "$(date -d "+1 minute" +%H:%M)" --name "$name" "$@" >/dev/null
}

tell_by() {
  install -d -m 0755 /etc/zelosched /etc/zelosched/run-ended.d
  cat >/etc/zelosched/run-ended.d/note <<'NOTE'
#!/bin/sh
echo "$ZELO_RUN_TASK_NAME $ZELO_RUN_OUTCOME $ZELO_RUN_EXIT_CODE: $(cat "$ZELO_RUN_OUTPUT")" >>/run/night_test.told
NOTE
  chmod 0755 /etc/zelosched/run-ended.d/note
}

saves_tasks() {
  z restore >/dev/null
  # Not so late in a minute that the next one has begun before all are saved; and not in its first second, in which
  # cron reads the crontab: it knows changes by their second, and would miss those of the same one.
  local second
  while second=$(date +%-S) && ((second > 50 || second < 2)); do sleep 1; done
  in_a_minute backup --owner "$NOBODY_ID" -- 'echo "rsync: no such host" >&2; no-such-program; exit 127' &&
    in_a_minute report -- 'echo all is well' &&
    in_a_minute hang --owner "$NOBODY_ID" -- 'echo begins; sleep 1000 & wait' &&
    in_a_minute late --time-limit 1s -- 'exec sleep 100' &&
    z add --quiet --daily 00:00 --name tomorrow -- true >/dev/null
}

cron_has_run_them() {
  local tenths
  for ((tenths = 0; tenths < PATIENCE; tenths++)); do
    if [[ $(z history --json | json '[r["state"] for r in tasks].count("ended")') == 3 ]]; then return 0; fi
    sleep 0.1
  done
  z history
  cat "$LOG"
  return 1
}

outcomes() {
  z history --json |
    json '" ".join(sorted(":".join([r["task_name"], r["outcome"] or r["state"], r["trigger"]]) for r in tasks))'
}

what_failed_is_told() {
  try z status --quiet
  [[ $status == 1 && $out == *"task 1 (backup) failed with exit code 127 at "*": 'zelosched log 1' shows what it printed"* &&
    $out == *"task 4 (late) ended by its time limit"* && $out != *report* ]] || { echo "$status $out"; return 1; }
}

ends_running_processes() {
  z stop hang >"$SCRATCH/out" 2>&1 || { cat "$SCRATCH/out"; return 1; }
  ! pgrep -f 'sleep 1000' && same "$(z history --task hang --json | json 'tasks[0]["outcome"]')" stopped
}

# When 'stop' returns the run has ended, and its keeper runs the notices after that.
everybody_was_told() {
  local tenths
  for ((tenths = 0; tenths < PATIENCE; tenths++)); do
    if grep -q hang "$TOLD"; then break; fi
    sleep 0.1
  done
  same "$(sort "$TOLD" | sed 's/: sh: .*//')" "$(sort <<'TOLD'
backup failed 127: rsync: no such host
sh: 1: no-such-program: not found
late time-limit 124: 
report finished 0: all is well
hang stopped : begins
TOLD
)"
}

what_was_missed_is_told() {
  kill "$(cat /var/run/crond.pid)"
  rm -f /var/run/crond.pid
  try env FAKE_TIME="$(date -d 'tomorrow 00:05' +%s)" LD_PRELOAD="$FAKE" "$ZELOSCHED" status
  [[ $status == 4 && $out == *"critical  cron is not running"* &&
    $out == *"task 5 (tomorrow) was due at $(date -d tomorrow +%F) 00:00 and did not run"* ]] || { echo "$status $out"; return 1; }
}

mkdir -p "$SCRATCH"
check "cron starts" start_cron "$LOG"
tell_by
check "tasks are saved" saves_tasks
check "cron runs them in their minute" cron_has_run_them
check "the history tells how each went" same "$(outcomes)" \
  "backup:failed:schedule hang:running:schedule late:time-limit:schedule report:finished:schedule"
check "status tells what failed" what_failed_is_told
check "the log tells why" same "$(z log backup | head -1)" "rsync: no such host"
check "failures alone are listed" same "$(z history --failed --json | json 'sorted(r["task_name"] for r in tasks)')" "['backup', 'late']"
check "what goes on is listed" same "$(z list --running --json | json '[t["name"] for t in tasks]')" "['hang']"
check "what it has printed so far is shown" same "$(z log hang)" "begins"
check "and it is ended, with all that it has started" ends_running_processes
check "whoever wants to know was told" everybody_was_told
check "what was missed is told" what_was_missed_is_told
finish
