#!/bin/bash
# The keeper of a run, through the programs that start it: what is written of a run, what it prints,
# what becomes of it when its keeper is killed or nothing can be written, and how it is stopped.
#
# Runs wait for a line in a named pipe, so that each is where the test wants it to be.
#
# Functions are called by check:
# shellcheck disable=SC2016,SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"

# shellcheck source=tests/support/zelosched_test.sh
. "$here/support/zelosched_test.sh"

readonly STARTER=$BUILD_DIR/bin/zeloschedtask
chmod 0755 "$SCRATCH"
cp /etc/crontab "$SCRATCH/crontab"

# ---- helpers --------------------------------------------------------------------------------

# Kills every keeper and run, also of a test that has failed in the middle.
clean() {
  local pid
  for pid in $(pgrep -x zeloschedtask || true); do kill -9 "$pid" 2>/dev/null || true; done
  umount -n /usr/zelo/var 2>/dev/null || true
  rm -rf /tmp/scheduled_tasks* /usr/zelo/etc/scheduled_tasks* "$STATUS"* /tmp/lock /usr/zelo/var /run/zelosched
  rm -rf /etc/zelosched /etc/zelosched.conf "$SCRATCH"/ran* "$SCRATCH"/told*
  cp "$SCRATCH/crontab" /etc/crontab
  rm -f "$SCRATCH/go" "$SCRATCH/begun"
  mkfifo -m 0666 "$SCRATCH/go" "$SCRATCH/begun"
}

# add COMMAND [OPTION...]
add() {
  local command=$1
  shift
  z add --quiet --daily 08:30 "$@" -- "$command" >/dev/null
}

# A command that reports that it has begun, and goes on when it has read a line.
readonly HOLD="echo \$PPID >$SCRATCH/begun; read -r line <$SCRATCH/go"

# Starts the task and waits until its command has begun; sets run_process.
start() {
  z run "$@" >/dev/null &
  read -r run_process <"$SCRATCH/begun"
  wait $!
}

go() {
  echo go >"$SCRATCH/go"
}

kept() {
  sql "$KEPT" "$@"
}

# until_is WANTED COMMAND...: waits up to half a minute until COMMAND prints WANTED
until_is() {
  local wanted=$1 got i
  shift
  for ((i = 0; i < 600; i++)); do
    got=$("$@" 2>/dev/null || true)
    if [[ $got == "$wanted" ]]; then return 0; fi
    sleep 0.05
  done
  same "$got" "$wanted"
}

# run_is WANTED COLUMNS: of the newest run.
run_is() {
  until_is "$1" kept "SELECT $2 FROM run ORDER BY run DESC LIMIT 1"
}

# As run_record.h numbers them.
readonly FINISHED=1 FAILED=2 KILLED=3 NOT_STARTED=4 TIME_LIMIT=5 GAVE_UP=6 CANCELLED=7 STOPPED=8 LOST=9

ended_as() {
  run_is "2 $1" "state, outcome"
}

keeper_of() {
  kept "SELECT keeper FROM run ORDER BY run DESC LIMIT 1"
}

is_gone() {
  until_is "" living "$1"
}

# A zombie counts as gone.
living() {
  ps -o stat= -p "$1" | grep -v Z
}

# The program as cron starts it, at the minute for which the task is due.
as_cron() {
  FAKE_TIME=$(date -u -d "2026-11-20 08:30:20" +%s) LD_PRELOAD=$FAKE timeout 60 "$STARTER" "$@"
}

# ---- what is written ------------------------------------------------------------------------

writes_how_a_run_of_crons_went() {
  clean
  add 'echo said; echo complained >&2; exit 7' --name backup
  as_cron --run id=1 || return 1
  ended_as "$FAILED" &&
    run_is "1 backup root 0 7 16 1" "task, task_name, owner, started_by, exit_code, output_bytes, duration < 60" &&
    run_is "2026-11-20 08:30:00" "datetime(due, 'unixepoch')" &&
    same "$(z log 1)" $'said\ncomplained'
}

writes_nothing_when_nothing_is_due() {
  clean
  add "echo ran >$SCRATCH/ran"
  rm -rf /usr/zelo/var
  FAKE_TIME=$(date -u -d "2026-11-20 09:31" +%s) LD_PRELOAD=$FAKE "$STARTER" --run id=1 || return 1
  is_gone_by_name && [[ ! -e $SCRATCH/ran && ! -e $KEPT && ! -e /run/zelosched ]]
}

is_gone_by_name() {
  until_is "" pgrep -x zeloschedtask
}

tells_the_caller_what_failed() {
  clean
  add true
  try "$STARTER" --run id=9
  [[ $status == 1 && $err == "zeloschedtask: cannot run task 9: 0x2000 "* ]] || { echo "$status $err"; return 1; }
}

shows_a_run_that_waits_and_for_whom() {
  clean
  add "$HOLD" --name long
  start 1
  same "$(z run 1)" "task 1 (long) waits for task 1 (long) to end" || return 1
  run_is "0 0" "state, outcome" && [[ $(z history | sed -n 2p) == *"waits for its turn"*long ]] || return 1
  [[ $(z list) == *"running for"* ]] || { z list; return 1; }
  local process
  process=$(kept "SELECT pid FROM run WHERE state = 0")
  z stop 1 >/dev/null
  is_gone "$process" && run_is "2 $CANCELLED" "state, outcome" &&
    until_is "2 $STOPPED" kept "SELECT state, outcome FROM run WHERE run = 1"
}

tells_that_a_run_gave_up() {
  clean
  add "$HOLD"
  start 1
  FAKE_PATIENCE=1 LD_PRELOAD=$FAKE try z run --wait 1
  same "$status $err" "1 zelosched: task 1 (Task 1) gave up waiting" && ended_as "$GAVE_UP" && go
}

an_interrupt_cancels_what_waits() {
  clean
  add "$HOLD"
  start 1
  # Where it is started in the background, a shell would have it ignore interrupts.
  python3 - "$ZELOSCHED" <<'INTERRUPT' || return 1
import signal, sqlite3, subprocess, sys, time
run = subprocess.Popen([sys.argv[1], "run", "--wait", "1"], stdout=subprocess.PIPE, text=True,
                       preexec_fn=lambda: signal.signal(signal.SIGINT, signal.SIG_DFL))
def waiting():
    return sqlite3.connect("/usr/zelo/var/history.sqlite", 30).execute(
        "SELECT count(*) FROM run WHERE state = 0").fetchone()[0]
while not waiting():
    time.sleep(0.02)
run.send_signal(signal.SIGINT)
said = run.communicate(timeout=60)[0]
if said != "task 1 (Task 1) will not run: it was waiting for its turn\n" or run.returncode != -signal.SIGINT:
    sys.exit(f"{said!r} {run.returncode}")
INTERRUPT
  ended_as "$CANCELLED" && run_is 1 "(SELECT count(*) FROM run WHERE state = 1)" && go
}

says_how_each_run_ended() {
  clean
  add 'exit 0' && add 'exit 3' && add 'kill -9 $$' && add 'kill -9 $PPID'
  local id wanted bad=0
  while read -r id wanted; do
    z run --wait "$id" >/dev/null 2>&1 || true
    same "$(kept "SELECT rtrim(printf('%d exit %s signal %s', outcome, exit_code, signal)) FROM run ORDER BY run DESC LIMIT 1")" \
      "$wanted" || bad=1
  done <<ENDS
1 $FINISHED exit 0 signal
2 $FAILED exit 3 signal
3 $KILLED exit  signal 9
4 $LOST exit  signal
ENDS
  return "$bad"
}

an_owner_who_is_gone_is_told_as_not_started() {
  clean
  add true
  sed -i 's/^owner=.*/owner="54321"/' /tmp/scheduled_tasks
  try z run --wait 1
  same "$status $err" "1 zelosched: task 1 (Task 1) could not start" && ended_as "$NOT_STARTED" &&
    run_is 54321 owner
}

# The process left behind is in another session, so 'timeout' does not signal it.
ends_what_is_left_past_the_limit() {
  clean
  add "timeout --kill-after=30s 1s sh -c 'setsid sh -c \"echo \\\$\\\$ >$SCRATCH/ran; exec sleep 1000\" & sleep 1000'"
  try z run --wait 1
  same "$status $err" "1 zelosched: task 1 (Task 1) ended by its time limit" && ended_as "$TIME_LIMIT" &&
    is_gone "$(cat "$SCRATCH/ran")"
}

# The time in which it waits does not count; that between its start and its discovery does.
counts_the_limit_from_the_start_after_waiting() {
  clean
  add "$HOLD" --app X --app-overlap no
  add "sleep 1000" --app X --app-overlap no --time-limit 1s
  start 1
  z run 2 >/dev/null && go && ended_as "$TIME_LIMIT" && run_is "1 1" "duration >= 1, duration < 10"
}

its_own_exit_code_before_the_limit_is_a_failure() {
  clean
  add "timeout --kill-after=30s 2h sh -c 'exit 124'"
  try z run --wait 1
  ended_as "$FAILED"
}

measures_by_a_clock_that_nobody_sets() {
  clean
  add "$HOLD"
  start 1
  # Its row says that it began tomorrow.
  sqlite3 "$STATUS" ".timeout 10000" "UPDATE task_status SET timestamp = timestamp + 86400"
  go
  ended_as "$FINISHED" && run_is "1 1" "duration >= 0, duration < 60"
}

check "how a run of cron's went is written, with what it printed" writes_how_a_run_of_crons_went
check "when nothing is due nothing is written, and nobody stays" writes_nothing_when_nothing_is_due
check "what failed at the start is told as ever" tells_the_caller_what_failed
check "a run that waits is shown, and for whom, and is stopped" shows_a_run_that_waits_and_for_whom
check "a run that gave up is written" tells_that_a_run_gave_up
check "an interrupt cancels what waits, and asks nothing" an_interrupt_cancels_what_waits
check "each end is told from the others" says_how_each_run_ended
check "an owner who is gone is a run that did not start" an_owner_who_is_gone_is_told_as_not_started
check "past its time limit nothing of a run goes on" ends_what_is_left_past_the_limit
check "nor when it waited before" counts_the_limit_from_the_start_after_waiting
check "before the limit the same exit code is a failure" its_own_exit_code_before_the_limit_is_a_failure
check "a clock that is set back changes no duration" measures_by_a_clock_that_nobody_sets

# ---- what it prints -------------------------------------------------------------------------

keeps_the_ends_of_much_output() {
  clean
  add 'head -c 16384 /dev/zero | tr "\0" a; head -c 10000000 /dev/zero; head -c 49152 /dev/zero | tr "\0" z'
  z run --wait 1 >/dev/null
  z log 1 >"$SCRATCH/out"
  { head -c 16384 /dev/zero | tr '\0' a; printf '\n[10000000 bytes are left out here]\n'
    head -c 49152 /dev/zero | tr '\0' z; } | cmp - "$SCRATCH/out" && run_is 10065536 output_bytes
}

is_not_filled_by_ten_gigabytes() {
  clean
  add 'head -c 10000000000 /dev/zero'
  z run --wait 1 >/dev/null
  run_is "10000000000 1 65536" "output_bytes, (SELECT count(*) FROM output), (SELECT max(size) FROM output)"
}

follows_what_goes_on() {
  clean
  add "echo first; $HOLD; echo last"
  start 1
  z log 1 --follow >"$SCRATCH/out" &
  until_is first cat "$SCRATCH/out" && go && wait $! && same "$(cat "$SCRATCH/out")" $'first\nlast'
}

# Only 'log --follow' can start another keeper.
follows_a_run_whose_keeper_is_killed() {
  clean
  add "echo first; $HOLD; echo last"
  start 1
  until_is 1 kept "SELECT state FROM run"
  local killed
  killed=$(keeper_of)
  z log 1 --follow >"$SCRATCH/out" &
  until_is first cat "$SCRATCH/out" && kill -9 "$killed" && is_gone "$killed" && go &&
    wait $! && same "$(head -n 1 "$SCRATCH/out")" first && ended_as "$FINISHED"
}

# As when it is stopped from its terminal, or its output goes to a pager that waits.
a_reader_who_stands_still_holds_up_no_keeper() {
  clean
  add "echo \$PPID >$SCRATCH/begun; exec yes" --time-limit 1s
  timeout --foreground 60 "$ZELOSCHED" run 1 --output >"$SCRATCH/out" 2>"$SCRATCH/err" &
  local waiting=$! reader
  read -r run_process <"$SCRATCH/begun"
  reader=$(pgrep -P "$waiting")
  kill -STOP "$reader"
  ended_as "$TIME_LIMIT" || return 1
  kill -CONT "$reader"
  wait "$waiting"
  # All of it comes when it reads again.
  same "$(cat "$SCRATCH/err")" "zelosched: task 1 (Task 1) ended by its time limit" && run_is "$(stat -c %s "$SCRATCH/out")" output_bytes &&
    is_gone_by_name
}

a_command_may_end_its_process_group() {
  clean
  add 'echo said; kill -KILL 0'
  z run --wait 1 >/dev/null 2>&1 || true
  same "$(z log 1)" said && run_is 2 state && is_gone_by_name
}

# A command that opens the pipe for reading can take only its own output.
what_reads_its_own_output_harms_nobody() {
  clean
  add 'exec 3<>/dev/stdout; echo said; head -c 5 <&3 >/dev/null; echo more' --owner nobody
  z run --wait 1 >/dev/null 2>&1 || true
  run_is 2 state && is_gone_by_name
}

a_run_may_close_its_output() {
  clean
  add "exec >&- 2>&-; $HOLD"
  start 1
  go
  ended_as "$FINISHED" && run_is 0 output_bytes
}

an_owner_writes_to_stderr_by_name() {
  clean
  add 'echo said >/dev/stderr; echo more >/dev/stdout' --owner nobody
  z run --wait 1 >/dev/null && same "$(z log 1)" $'said\nmore'
}

a_daemon_does_not_keep_a_run_from_ending() {
  clean
  add "setsid sh -c 'echo \$\$ >$SCRATCH/ran; read -r line <$SCRATCH/go; head -c 1000000 /dev/zero; echo wrote >$SCRATCH/ran2' & until test -s $SCRATCH/ran; do :; done; echo said"
  z run --wait 1 >/dev/null && same "$(z log 1)" said && ended_as "$FINISHED" || return 1
  # It is still read, but does not belong to the run any more.
  fails_saying "is not running" z stop 1 && go && until_is wrote cat "$SCRATCH/ran2" && is_gone_by_name
}

# fails_saying TEXT COMMAND...
fails_saying() {
  local text=$1
  shift
  try "$@"
  [[ $status != 0 && $err == *"$text"* ]] || { echo "$status $err"; return 1; }
}

keeps_no_more_than_is_set() {
  clean
  printf 'output-runs = 2 # of a task\noutput-first=10\noutput-last = 1K\nruns-of-task = 3\nruns-days = 0\n' >/etc/zelosched.conf
  add 'seq 1000'
  local i
  for i in 1 2 3 4 5; do z run --wait 1 >/dev/null; done
  same "$(kept "SELECT group_concat(run), max(size) FROM output")" "4,5 1034" || return 1
  kept "UPDATE run SET moment = moment - 10"
  z history --keep && same "$(kept "SELECT group_concat(run) FROM run")" 3,4,5 &&
    fails_saying "3893 bytes that run 3 printed are not kept any more" z log 1 --run 3
}

keeps_no_more_than_is_set_of_all_tasks() {
  clean
  printf 'output-total = 2K\nruns-total = 4\n' >/etc/zelosched.conf
  add 'seq 250'
  add 'seq 250'
  local i
  for i in 1 2 3; do z run --wait 1 2 >/dev/null; done
  same "$(kept "SELECT group_concat(run), sum(size) FROM output")" "5,6 1784" || return 1
  z history --keep && same "$(kept "SELECT group_concat(run) FROM run")" 3,4,5,6
}

keeps_none_on_a_disk_that_is_nearly_full() {
  clean
  echo 'output-free = 100%' >/etc/zelosched.conf
  add 'echo said'
  z run --wait 1 >/dev/null && ended_as "$FINISHED" && same "$(kept "SELECT count(*) FROM output")" 0
}

tells_of_a_setting_that_is_wrong() {
  clean
  printf 'output-runs = many\nno-such = 1\nruns-days\n' >/etc/zelosched.conf
  add 'echo said'
  try z history
  same "$err" "zelosched: /etc/zelosched.conf, line 1: output-runs is a number from 0 to 100000, not 'many': the usual value holds
zelosched: /etc/zelosched.conf, line 2: there is no setting 'no-such': the usual value holds
zelosched: /etc/zelosched.conf, line 3: 'runs-days' has no '=': the usual value holds" &&
    z run --wait 1 >/dev/null && same "$(z log 1 2>/dev/null)" said
}

check "of much output the ends are kept" keeps_the_ends_of_much_output
check "ten gigabytes fill nothing" is_not_filled_by_ten_gigabytes
check "what goes on is followed to its end" follows_what_goes_on
check "also when its keeper is killed" follows_a_run_whose_keeper_is_killed
check "a reader who stands still holds up no keeper" a_reader_who_stands_still_holds_up_no_keeper
check "a command may end its process group" a_command_may_end_its_process_group
check "what reads its own output harms nobody" what_reads_its_own_output_harms_nobody
check "a run may close its output at once" a_run_may_close_its_output
check "an owner may open his output by its name" an_owner_writes_to_stderr_by_name
check "a daemon that holds the pipe is read on, and is not the run's" a_daemon_does_not_keep_a_run_from_ending
check "no more is kept than is set" keeps_no_more_than_is_set
check "nor of all tasks together" keeps_no_more_than_is_set_of_all_tasks
check "no output is kept on a disk that is nearly full" keeps_none_on_a_disk_that_is_nearly_full
check "a setting that is wrong is told, and changes nothing" tells_of_a_setting_that_is_wrong

# ---- faults ---------------------------------------------------------------------------------

# It then prints more than a pipe holds, and no write may fail.
a_killed_keeper_ends_no_run() {
  clean
  add "echo first; $HOLD; head -c 1000000 /dev/zero && echo ran >$SCRATCH/ran"
  start 1
  local killed
  until_is 1 kept "SELECT state FROM run"
  killed=$(keeper_of)
  kill -9 "$killed"
  is_gone "$killed"
  z history >/dev/null # starts another keeper
  until_is 0 kept "SELECT keeper = $killed FROM run" && go && ended_as "$FINISHED" &&
    same "$(cat "$SCRATCH/ran")" ran && run_is 1000006 output_bytes && same "$(z log 1 | head -c 5)" first
}

a_killed_keeper_leaves_the_end_to_the_sweep() {
  clean
  add "echo first; $HOLD; exit 4"
  start 1
  until_is 1 kept "SELECT state FROM run"
  kill -9 "$(keeper_of)"
  go
  is_gone "$run_process"
  z history >/dev/null
  ended_as "$FAILED" && run_is "1 4" "count(*), exit_code" && same "$(z log 1)" first
}

# The caller inherits the run's process, and starts the run itself where there is none.
a_keeper_killed_before_the_run_loses_nothing() {
  clean
  add "echo ran >>$SCRATCH/ran"
  cat >"$SCRATCH/killer.c" <<'KILLER'
#include <signal.h>
#include <stdlib.h>
#include <unistd.h>
/* Kills the keeper, which alone has a session of its own by then. */
int ZELOSchedTaskRun(long id, int check, int skip);
#define _GNU_SOURCE
#include <dlfcn.h>
int ZELOSchedTaskRun(long id, int check, int skip) {
  int (*real)(long, int, int) = (int (*)(long, int, int))dlsym((void *)-1L, "ZELOSchedTaskRun");
  int result;
  if (getsid(0) != getpid()) return real(id, check, skip);
  if (getenv("KILL_AFTER") == NULL) raise(SIGKILL);
  result = real(id, check, skip);
  raise(SIGKILL);
  return result;
}
KILLER
  cc -w -shared -fPIC -o "$SCRATCH/killer.so" "$SCRATCH/killer.c" -ldl || return 1
  LD_PRELOAD=$SCRATCH/killer.so setsid --wait sh -c "'$STARTER' --run id=1 --now" || return 1
  until_is ran cat "$SCRATCH/ran" || return 1
  LD_PRELOAD=$SCRATCH/killer.so KILL_AFTER=1 setsid --wait sh -c "'$STARTER' --run id=1 --now" || return 1
  until_is $'ran\nran' cat "$SCRATCH/ran" && is_gone_by_name && same "$(z history | wc -l)" 3
}

# runs_without_its_record FAULT: the run takes place, and is in the status database
runs_without_its_record() {
  local fault=$1
  clean
  add "echo ran >$SCRATCH/ran"
  "$fault"
  timeout 60 "$STARTER" --run id=1 --now || return 1
  until_is ran cat "$SCRATCH/ran" && until_is 3 sqlite3 "$STATUS" "SELECT status_code FROM task_status"
}

no_directory() { rm -rf /usr/zelo/var && touch /usr/zelo/var; }
no_database() { head -c 9000 /dev/zero | tr '\0' x >"$KEPT"; }
later_version() { kept "PRAGMA user_version = 99"; }
no_room() { mount -n -t tmpfs -o mode=0755,size=4k var /usr/zelo/var; }

# start_without_room: starts a run while there is no room for the history, and then makes some
start_without_room() {
  clean
  mkdir -p /usr/zelo/var
  mount -n -t tmpfs -o mode=0755,size=4k var /usr/zelo/var
  add "$HOLD; echo said" 2>/dev/null
  start 1
  until_is 0 stat -c %s "$KEPT" && mount -n -o remount,size=10m /usr/zelo/var && z history >/dev/null
}

stops_a_run_that_the_sweep_has_found() {
  start_without_room && z stop 1 >/dev/null && ended_as "$STOPPED" &&
    run_is "1 1 1" "count(*), started_by, stop_asked IS NOT NULL"
}

a_run_is_written_once_there_is_room() {
  start_without_room && run_is "1 1 1" "count(*), started_by, keeper <> 0" && go && ended_as "$FINISHED" &&
    same "$(z log 1)" said && run_is 1 "count(*)"
}

a_run_does_not_wait_for_a_locked_history() {
  clean
  add "$HOLD; head -c 1000000 /dev/zero; echo ran >$SCRATCH/ran"
  python3 - "$KEPT" "$STARTER" "$SCRATCH" <<'HOLD' || return 1
import os, sqlite3, subprocess, sys, time
held = sqlite3.connect(sys.argv[1], isolation_level=None)
held.execute("BEGIN EXCLUSIVE")
subprocess.run([sys.argv[2], "--run", "id=1", "--now"], timeout=60, check=True)
open(sys.argv[3] + "/begun").read()
open(sys.argv[3] + "/go", "w").write("go\n")
while not os.path.exists(sys.argv[3] + "/ran"):
    time.sleep(0.02)
held.execute("COMMIT")
HOLD
  ended_as "$FINISHED" && run_is 1000000 output_bytes
}

# When a keeper's commit fails, the entry of the task is rolled back too.
a_run_is_its_tasks_own_after_a_commit_that_failed() {
  clean
  add 'exit 1' --name one
  add 'exit 2' --name two
  kept "DELETE FROM task" # as if another program had made them
  python3 - "$KEPT" "$STARTER" <<'READ' || return 1
import sqlite3, subprocess, sys, time
reader = sqlite3.connect(sys.argv[1], isolation_level=None)
reader.execute("BEGIN")
reader.execute("SELECT count(*) FROM run").fetchall()
for task in "2", "1":
    subprocess.run([sys.argv[2], "--run", "id=" + task, "--now"], timeout=60, check=True)
time.sleep(1)
reader.execute("COMMIT")
READ
  until_is "1 one 1|2 two 2" kept "SELECT group_concat(words, '|') FROM (SELECT task.task || ' ' || name || ' ' || exit_code AS words
    FROM run JOIN task USING(generation) ORDER BY run.task)"
}

# The sweep writes it when there is room again, and it alone runs the programs of run-ended.d.
an_end_without_room_is_left_to_the_sweep() {
  clean
  mkdir -p /usr/zelo/var /etc/zelosched/run-ended.d
  mount -n -t tmpfs -o mode=0755,size=1m var /usr/zelo/var
  printf '#!/bin/sh\necho "$ZELO_RUN $ZELO_RUN_OUTCOME $(tail -n 1 "$ZELO_RUN_OUTPUT")" >>%s/told\n' "$SCRATCH" >/etc/zelosched/run-ended.d/tell
  chmod 0755 /etc/zelosched/run-ended.d/tell
  add "$HOLD; sleep 1000 & echo said; exit 9"
  start 1
  until_is 1 kept "SELECT state FROM run"
  local keeper
  keeper=$(keeper_of)
  dd if=/dev/zero of=/usr/zelo/var/fill bs=1k 2>/dev/null || true
  go
  is_gone "$keeper" && run_is "1 0" "state, told" || return 1
  rm /usr/zelo/var/fill
  z history --keep >/dev/null
  ended_as "$FAILED" && same "$(z log 1)" said && until_is "1 failed said" cat "$SCRATCH/told" && sleep 0.3 &&
    same "$(cat "$SCRATCH/told")" "1 failed said" && same "$(ls /run/zelosched)" "" && pkill -x sleep && is_gone_by_name
}

the_history_can_be_unmounted_while_a_command_runs() {
  clean
  mkdir /usr/zelo/var
  mount -n -t tmpfs -o mode=0755 var /usr/zelo/var
  add "$HOLD"
  start 1
  until_is 1 kept "SELECT state FROM run"
  local i
  for ((i = 0; i < 600; i++)); do umount -n /usr/zelo/var 2>/dev/null && break; sleep 0.05; done
  ! mountpoint -q /usr/zelo/var && go && is_gone "$run_process" && ended_as "$FINISHED"
}

two_hundred_runs_at_once_are_all_written() {
  clean
  add true --overlap yes
  local i
  for ((i = 0; i < 200; i++)); do "$STARTER" --run id=1 --now & done
  wait
  until_is "200 200 200" kept "SELECT count(*), count(DISTINCT status_id), sum(outcome = 1) FROM run"
  z history >/dev/null && same "$(kept "SELECT count(*) FROM run")" 200
}

check "a killed keeper ends no run, and another one reads on" a_killed_keeper_ends_no_run
check "without one the sweep writes the end" a_killed_keeper_leaves_the_end_to_the_sweep
check "one that is killed before the run, or right after its start, loses none" \
  a_keeper_killed_before_the_run_loses_nothing
check "a run takes place without a directory for the history" runs_without_its_record no_directory
check "and where its file is no database" runs_without_its_record no_database
check "and where that is of a later version" runs_without_its_record later_version
check "and where there is no room" runs_without_its_record no_room
check "it is stopped when the sweep alone has found it" stops_a_run_that_the_sweep_has_found
check "and is written while it goes on, once there is room" a_run_is_written_once_there_is_room
check "nor does it wait for a history that is locked" a_run_does_not_wait_for_a_locked_history
check "a run is its own task's after a commit that failed" a_run_is_its_tasks_own_after_a_commit_that_failed
check "an end for which there is no room is left to the sweep, and told once" an_end_without_room_is_left_to_the_sweep
check "the history can be unmounted while a command runs" the_history_can_be_unmounted_while_a_command_runs
check "two hundred runs at once are all written, once" two_hundred_runs_at_once_are_all_written

# ---- stopping -------------------------------------------------------------------------------

# In the background, in a session of its own, in another process group, and one that ignores it.
stops_all_of_a_run() {
  clean
  add "sleep 1000 & setsid sleep 1000 & setsid sh -c 'sleep 1000 & exit' ; (trap : TERM; echo \$PPID >$SCRATCH/begun; while :; do sleep 1000; done)"
  start 1
  same "$(z stop 1 --grace 1)" "task 1 (Task 1) stopped; something of it had to be killed" &&
    ended_as "$STOPPED" && until_is "" pgrep -x sleep && same "$(sqlite3 "$STATUS" "SELECT status_code IN (6, 7) FROM task_status")" 1
}

stops_what_forks_all_the_time() {
  clean
  add "trap : TERM; echo \$PPID >$SCRATCH/begun; while :; do setsid sh -c 'trap : TERM; sleep 1000' & sleep 0.01; done"
  start 1
  z stop 1 --grace 0 >/dev/null && ended_as "$STOPPED" && until_is "" pgrep -x sleep
}

one_that_finishes_all_the_same_has_finished() {
  clean
  add "trap 'exit 0' TERM; $HOLD; exit 0"
  start 1
  z stop 1 >/dev/null && ended_as "$FINISHED" && run_is 1 "stop_asked IS NOT NULL"
}

stops_a_run_without_keeper() {
  clean
  add "$HOLD"
  start 1
  until_is 1 kept "SELECT state FROM run"
  kill -9 "$(keeper_of)"
  is_gone "$(keeper_of)"
  [[ $(z stop 1) == "task 1 (Task 1) stopped"* ]] && is_gone "$run_process" && z history >/dev/null && ended_as "$STOPPED"
}

a_removed_task_starts_no_more() {
  clean
  add "$HOLD; echo ran >>$SCRATCH/ran"
  start 1
  z run 1 >/dev/null
  same "$(z remove --yes 1)" "a run of it was waiting for its turn and will not run
task 1 (Task 1) removed
a run of it is under way, and goes on: 'zelosched stop 1' ends it" || return 1
  go
  is_gone_by_name && same "$(cat "$SCRATCH/ran")" ran
}

a_removed_task_is_stopped_when_wanted() {
  clean
  add "$HOLD; echo ran >>$SCRATCH/ran"
  start 1
  same "$(z remove --yes --stop 1)" "task 1 (Task 1) removed
a run of it stopped" && is_gone_by_name && [[ ! -e $SCRATCH/ran ]]
}

a_disabled_task_goes_on_and_is_told() {
  clean
  add "$HOLD"
  start 1
  same "$(z disable 1)" "task 1 (Task 1) disabled
a run of it is under way, and goes on: 'zelosched stop 1' ends it" &&
    same "$(z enable 1; z disable --stop 1)" "task 1 (Task 1) enabled
task 1 (Task 1) disabled
a run of it stopped" && ended_as "$STOPPED"
}

stop_races_the_end() {
  clean
  add true --overlap yes
  local i
  for ((i = 0; i < 20; i++)); do
    z run 1 >/dev/null
    z stop 1 >/dev/null 2>&1 || true
  done
  is_gone_by_name && same "$(kept "SELECT count(*), sum(outcome IN ($FINISHED, $STOPPED, $CANCELLED)) FROM run")" "20 20"
}

check "every process of a run is stopped, wherever it went" stops_all_of_a_run
check "also of one that forks all the time" stops_what_forks_all_the_time
check "one that does all that it had to do has finished" one_that_finishes_all_the_same_has_finished
check "a run without a keeper is stopped" stops_a_run_without_keeper
check "no run of a removed task starts" a_removed_task_starts_no_more
check "and one that goes on is stopped when wanted" a_removed_task_is_stopped_when_wanted
check "that of a disabled task is told, and stopped when wanted" a_disabled_task_goes_on_and_is_told
check "whoever is first of stop and end, one of them is written" stop_races_the_end

# ---- whose runs they are --------------------------------------------------------------------

a_new_task_inherits_no_run() {
  clean
  add 'exit 3' --name old
  z run --wait 1 2>/dev/null || true
  z remove --yes 1 >/dev/null
  add true --name new
  same "$(z history 1 | wc -l)" 1 && same "$(z history | sed -n 2p | awk '{ print $NF }')" old &&
    z run --wait 1 >/dev/null && same "$(z history 1 | sed -n 2p | awk '{ print $NF }')" new
}

# As another program does it: only the store has the change, not the history.
notes_what_others_changed() {
  clean
  add 'exit 3' --name old
  z run --wait 1 2>/dev/null || true
  sed -i 's/^name=.*/name="renamed"/' /tmp/scheduled_tasks
  same "$(z history 1 | wc -l)" 2 || return 1
  sed -i 's/^name=.*/name="other"/;s/^cmd base64=.*/cmd base64="dHJ1ZQ=="/;s/^cmd=.*/cmd="dHJ1ZQ=="/' /tmp/scheduled_tasks
  same "$(z history 1 | wc -l)" 1 && same "$(kept "SELECT count(*), count(removed) FROM task")" "2 1"
}

filters_the_history() {
  clean
  add 'exit 3' --name bad
  add true --name good
  z run --wait 1 2 >/dev/null 2>&1 || true
  kept "UPDATE run SET moment = 1000 WHERE run = 1"
  same "$(z history --failed | tail -n +2 | awk '{ print $NF }')" bad &&
    same "$(z history --since 1h | tail -n +2 | awk '{ print $NF }')" good &&
    same "$(z history --task 1 | tail -n +2 | awk '{ print $NF }')" bad &&
    fails_saying "'--since' takes a time such as" z history --since yesterday
}

check "a new task inherits no run of a removed one" a_new_task_inherits_no_run
check "what other programs change is noted" notes_what_others_changed
check "the history is filtered" filters_the_history

finish
