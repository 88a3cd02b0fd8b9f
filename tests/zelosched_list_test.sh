#!/bin/bash
# The list, tasks by their names, and time limits, as an administrator uses them.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"
# shellcheck source=tests/support/have_terminals.sh
. "$here/support/have_terminals.sh"
# shellcheck source=tests/support/zelosched_test.sh
. "$here/support/zelosched_test.sh"

readonly USAGE=2
unset COLUMNS

# ---- helpers --------------------------------------------------------------------------------

gives() {
  local wanted_status=$1 wanted=$2
  shift 2
  try z "$@"
  same "$status: $out$err" "$wanted_status: $wanted"
}

# on_terminal COLUMNS COMMAND...: what is seen on a terminal so wide
on_terminal() {
  python3 - "$ZELOSCHED" "$@" <<'PTY'
import fcntl, os, pty, struct, sys, termios
zelosched, columns, *words = sys.argv[1:]
pid, terminal = pty.fork()
if pid == 0:
    fcntl.ioctl(0, termios.TIOCSWINSZ, struct.pack("HHHH", 24, int(columns), 0, 0))
    os.execve(zelosched, [zelosched, *words], {**os.environ, "NO_COLOR": "1", "LC_ALL": "C.UTF-8"})
seen = b""
try:
    while chunk := os.read(terminal, 65536):
        seen += chunk
except OSError:
    pass
os.waitpid(pid, 0)
print(seen.decode().replace("\r\n", "\n"), end="")
PTY
}

chosen() {
  z list --sort id --json "$@" | python3 -c 'import json, sys
print(*(task["name"] for task in json.load(sys.stdin)["tasks"]), sep=",")'
}

stored_command() {
  z export --wire "$1" | python3 -c 'import base64, json, sys
print(base64.b64decode(json.loads(json.load(sys.stdin)["cmd"])).decode(), end="")'
}

# ---- the list -------------------------------------------------------------------------------

readonly HISTORY=/usr/zelo/var/history.sqlite
# The keeper writes the run into the history once more after it has reported its end.
started_at_nine() {
  until [[ $(sqlite3 "$HISTORY" "SELECT count(*) FROM run WHERE state = 2 AND told = 0") == 0 ]]; do sleep 0.01; done
  sqlite3 /tmp/sched_status.sqlite "UPDATE task_status SET timestamp = $(date -u -d '2026-11-22 09:00' +%s)"
  sqlite3 "$HISTORY" "UPDATE run SET start = $(date -u -d '2026-11-22 09:00' +%s), moment = $(date -u -d '2026-11-22 09:00' +%s),
    ended = iif(state = 2, $(date -u -d '2026-11-22 09:00' +%s), NULL)"
}

common_tasks() {
  clean
  add --daily 02:30 --name "Nightly backup" --owner root -- 'exit 7'
  add --weekly mon-fri 08:00 --every 2h --name "Sync mail" -- true
  add --monthly 15 08:30 --name Report -- true
  add --once 2027-12-24T18:30 --name Christmas -- true
  add --daily 12:00 --name Off --disabled -- true
  z run 1 --wait >/dev/null 2>&1 || true
  z run 2 --wait >/dev/null
  started_at_nine
}

readonly AT_A_GLANCE="ID  NAME            OWNER  SCHEDULE                NEXT RUN    LAST RUN
 2  Sync mail       root   mon-fri 08:00 every 2h  Mon 08:00   finished, 3 h ago
 1  Nightly backup  root   daily 02:30             Mon 02:30   failed 7, 3 h ago
 3  Report          root   monthly 15 08:30        15 Dec      -
 4  Christmas       root   2027-12-24 18:30        2027-12-24  -
 5  Off             root   daily 12:00             disabled    -"

tells_at_a_glance() {
  common_tasks
  same "$(at '2026-11-22 12:30' list | sort)" "$(sort <<<"$AT_A_GLANCE")"
}

is_whole_at_80_columns() {
  common_tasks
  z remove --yes Christmas >/dev/null
  export FAKE_TIME LD_PRELOAD
  FAKE_TIME=$(date -u -d '2026-11-22 12:30' +%s) LD_PRELOAD=$FAKE on_terminal 80 list >"$SCRATCH/seen"
  unset FAKE_TIME LD_PRELOAD
  awk 'length > 80 { exit 1 }' "$SCRATCH/seen" && same "$(wc -l <"$SCRATCH/seen")" 5 &&
    grep -q 'mon-fri 08:00 every 2h  Mon 08:00  finished, 3 h ago' "$SCRATCH/seen" && ! grep -q '…' "$SCRATCH/seen"
}

# The wide and the narrow list have the same words.
nothing_is_lost_at_60_columns() {
  local name
  common_tasks
  name="a name that goes on and on and on, without being of any further use"
  add --weekly mon,wed,fri 08:15 --every 3h --until 17 --owner nobody --name "$name" -- true
  on_terminal 60 list >"$SCRATCH/seen"
  awk 'length > 60 { exit 1 }' "$SCRATCH/seen" && ! grep -q '…' "$SCRATCH/seen" &&
    same "$(tr -s ' \n' '\n' <"$SCRATCH/seen" | sed '/^$/d' | sort)" "$(z list | tr -s ' \n' '\n' | sed '/^$/d' | sort)"
}

power_times_come_when_asked_for() {
  common_tasks
  z power add off --weekly mon-fri 23:00 >/dev/null
  [[ $(z list) != *92* ]] && [[ $(z list --power) == *"PowerOff task 0"*"mon-fri 23:00"* ]] &&
    [[ $(z power list) == *"off"* ]]
}

chooses() {
  common_tasks
  add --daily 08:30 --name other --app backup --owner nobody -- 'sleep 100'
  z run 6 >/dev/null
  until [[ -n $(chosen --running) ]]; do sleep 0.01; done
  same "$(chosen --failed)|$(chosen --owner nobody)|$(chosen --owner 65534)|$(chosen --app backup)|$(chosen --running)|$(
    chosen --owner root --failed)|$(chosen --owner nobody --failed)" \
    "Nightly backup|other|other|other|other|Nightly backup|" &&
    gives 1 "zelosched: there is no user 'nix'" list --owner nix
}

a_run_that_goes_on_is_told() {
  clean
  add --daily 08:30 --name long -- 'sleep 100'
  z run 1 >/dev/null
  until [[ $(z list) == *running* ]]; do sleep 0.01; done
  started_at_nine
  [[ $(at '2026-11-22 09:17' list | tail -1) == *"  running for 17 min" ]]
}

runs_that_cannot_be_seen_are_not_chosen_from() {
  common_tasks
  head -c 8192 /dev/urandom >"$HISTORY"
  try z list --failed
  [[ $status == 1 && -z $out && $err == "zelosched: cannot "*" $HISTORY: "* ]] || return 1
  try z list
  [[ $status == 1 && $out == *"Nightly backup"*"  ?"* && $err == "zelosched: cannot "*" $HISTORY: "* ]]
}

what_is_known_is_shown_beside_a_damaged_status_database() {
  common_tasks
  head -c 8192 /dev/urandom >/tmp/sched_status.sqlite
  try z list --failed
  [[ $status == 1 && $out == *"Nightly backup"*"failed 7"* && $err == "zelosched: cannot read /tmp/sched_status.sqlite: "* ]]
}

# ---- names ----------------------------------------------------------------------------------

takes_names() {
  clean
  add --daily 08:30 --name "Nightly backup" -- true
  add --daily 09:30 --name Mirror -- true
  [[ $(z show Mirror) == *"ID: 2"* ]] &&
    gives 0 "task 2 (Mirror) disabled" disable Mirror && gives 0 "task 2 (Mirror) enabled" enable Mirror &&
    gives 0 "task 1 (Nightly backup) saved: daily at 03:00" edit "Nightly backup" --daily 03:00 &&
    gives 0 "task 1 (Nightly backup) finished" run "Nightly backup" --wait &&
    [[ $(z next Mirror --count 1) == *"  2  Mirror"* && $(z history Mirror | wc -l) == 1 ]] &&
    [[ $(z export Mirror) == *'"name": "Mirror"'* && $(z export Mirror) != *Nightly* ]] &&
    [[ $(z show Mirror 2 --json | grep -c '"id"') == 1 ]] &&
    gives 0 "task 2 (Mirror) removed" remove --yes Mirror
}

a_name_of_several_is_refused() {
  local command
  clean
  add --daily 08:30 --name same -- true
  add --daily 08:30 --name other -- true
  add --daily 08:30 --name same --app app -- true
  add --daily 08:30 --name same --app apps -- true
  for command in show enable disable 'remove --yes' run next export; do
    # shellcheck disable=SC2086
    gives 1 "zelosched: 'same' is the name of tasks 1, 3 and 4: give the id of one" $command same || return 1
  done
  gives 1 "zelosched: 'same' is the name of tasks 1, 3 and 4: give the id of one" edit same --daily 09:00 &&
    same "$(chosen)" "same,other,same,same"
}

an_unknown_name_changes_nothing() {
  clean
  add --daily 08:30 --name one -- true
  gives 1 "zelosched: there is no task of the name 'two'" remove --yes one two && same "$(chosen)" one &&
    gives 1 "zelosched: there is no task of the name 'One'" show One &&
    gives 1 "zelosched: there is no task of the name 'a\\x1b'" show $'a\e' &&
    gives 1 "zelosched: there is no task of the name ''" show ''
}

digits_are_an_id() {
  clean
  add --daily 08:30 --name 2 -- true
  add --daily 08:30 --name 1 -- true
  add --daily 08:30 --name 7 -- true
  [[ $(z show 1) == *"ID: 1"*"Name: 2"* ]] && gives 1 "zelosched: there is no task 7" show 7 &&
    add --daily 08:30 --name 3a -- true && [[ $(z show 3a) == *"ID: 4"* ]]
}

power_times_have_names() {
  clean
  z power add off --daily 23:00 >/dev/null
  gives 0 "task 91272300 (Poweroff 0) removed" power remove --yes 'PowerOff task 0'
}

# ---- time limits ----------------------------------------------------------------------------

a_limit_is_stored_as_others_can_read_it() {
  clean
  add --daily 08:30 --name one --time-limit 2h -- "echo 'it'; exit 3"
  same "$(stored_command 1)" "timeout --kill-after=30s 2h sh -c 'echo '\\''it'\\''; exit 3'" &&
    [[ $(z show 1) == *"Command: echo 'it'; exit 3"$'\n'"  Time limit: 2h"* ]] && [[ $(z show 1) != *timeout* ]] &&
    gives 1 "zelosched: task 1 (one) failed with exit code 3" run --wait 1
}

an_edit_keeps_the_limit() {
  clean
  add --daily 08:30 --name one --time-limit 2h -- 'echo a'
  z edit one --daily 09:30 >/dev/null
  same "$(stored_command 1)" "timeout --kill-after=30s 2h sh -c 'echo a'" || return 1
  z edit one -- 'echo b' >/dev/null
  same "$(stored_command 1)" "timeout --kill-after=30s 2h sh -c 'echo b'" || return 1
  z edit one --time-limit 90s >/dev/null
  same "$(stored_command 1)" "timeout --kill-after=30s 90s sh -c 'echo b'" || return 1
  z edit one --time-limit none >/dev/null
  same "$(stored_command 1)" "echo b" || return 1
  z edit one --time-limit 1d -- echo "c d" >/dev/null
  same "$(stored_command 1)" "timeout --kill-after=30s 1d sh -c 'echo '\\''c d'\\'''"
}

other_commands_are_shown_as_they_are() {
  clean
  add --daily 08:30 --name one -- "timeout 2h sh -c 'echo a'"
  [[ $(z show one) == *"Command: timeout 2h sh -c 'echo a'"* && $(z show one) != *"Time limit"* ]]
}

wrong_limits_are_usage_errors() {
  local limit
  clean
  add --daily 08:30 --name one -- true
  for limit in 2 2w 0h -1h '2 h' ''; do
    try z edit one --time-limit "$limit"
    [[ $status == "$USAGE" && $err == *"'--time-limit' takes 90s, 30m, 2h, 1d or none, not '$limit'"* ]] ||
      { echo "$limit: $err"; return 1; }
  done
  same "$(stored_command 1)" true
}

a_limit_is_not_for_power_times() {
  clean
  z power add off --daily 23:00 >/dev/null
  try z edit 91272300 --time-limit 2h
  [[ $status == "$USAGE" && $err == *"only --daily and --weekly"* ]]
}

# Half a command is another command.
a_command_that_grows_too_long_is_refused() {
  local most=12287 around
  clean
  around=$(printf "timeout --kill-after=30s 2h sh -c ''" | wc -c)
  add --daily 08:30 --name one --time-limit 2h -- "$(printf "%0$((most - around))d" 0)"
  same "$(stored_command 1 | wc -c)" "$most" || return 1
  gives 1 "zelosched: not saved: with its time limit the command is 12288 bytes long, and only 12287 can be stored: put it into a script" \
    edit one -- "$(printf "%0$((most - around + 1))d" 0)" || return 1
  # Each apostrophe becomes four characters.
  try z add --daily 08:30 --time-limit 2h -- "$(printf "%3100s" '' | tr ' ' "'")"
  [[ $status == 1 && $err == *"with its time limit the command is"* ]] && same "$(stored_command 1 | wc -c)" "$most"
}

start_zelosched_tests
check "the list tells at a glance what runs when, and how it went" tells_at_a_glance
check "it is whole at 80 columns" is_whole_at_80_columns
check "and loses nothing at 60" nothing_is_lost_at_60_columns
check "power times are listed when they are asked for" power_times_come_when_asked_for
check "tasks are chosen by owner, application, failure and run" chooses
check "how long a run goes on is told" a_run_that_goes_on_is_told
check "nothing is chosen by runs that cannot be seen" runs_that_cannot_be_seen_are_not_chosen_from
check "what is known is shown beside a damaged status database" what_is_known_is_shown_beside_a_damaged_status_database
check "a task is named by its name wherever its id is taken" takes_names
check "a name of several tasks is refused with their ids" a_name_of_several_is_refused
check "a name of no task keeps all as it is" an_unknown_name_changes_nothing
check "digits alone are an id" digits_are_an_id
check "power times can be named too" power_times_have_names
check "a time limit is part of the stored command, and shown apart" a_limit_is_stored_as_others_can_read_it
check "an edit of something else keeps it" an_edit_keeps_the_limit
check "a command of another form is shown as it is" other_commands_are_shown_as_they_are
check "what is no limit is refused" wrong_limits_are_usage_errors
check "a power time has none" a_limit_is_not_for_power_times
check "a command that is too long with its limit is refused" a_command_that_grows_too_long_is_refused
finish
