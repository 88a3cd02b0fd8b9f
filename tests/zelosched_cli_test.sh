#!/bin/bash
# The administrator's program as a script uses it: what it prints and changes, what it refuses, and
# how it fails.
#
# Functions are called by check, and what stands in single quotes is for another shell:
# shellcheck disable=SC2317,SC2016
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"
# shellcheck source=tests/support/have_terminals.sh
. "$here/support/have_terminals.sh"
# shellcheck source=tests/support/zelosched_test.sh
. "$here/support/zelosched_test.sh"

readonly SCRATCH=/tmp/zelosched_cli_test
readonly STORE=/tmp/scheduled_tasks
readonly PERSISTENT=/usr/zelo/etc/scheduled_tasks
readonly USAGE=2
unset LC_ALL LANG NO_COLOR
export TZ=UTC
mkdir -p "$SCRATCH"
cp /etc/crontab "$SCRATCH/crontab"

# ---- helpers --------------------------------------------------------------------------------

gives() {
  local wanted_status=$1 wanted=$2
  shift 2
  try z "$@"
  same "$status: $out$err" "$wanted_status: $wanted"
}

# The status, and a part of what is said on standard error; nothing on standard output.
fails_saying() {
  local wanted_status=$1 part=$2
  shift 2
  try "$@"
  [[ $status == "$wanted_status" && $err == *"$part"* && -z $out ]] ||
    { printf 'status %s\nout: %s\nerr: %s\nwanted %s: %s\n' "$status" "$out" "$err" "$wanted_status" "$part"; return 1; }
}

clean() {
  rm -rf "$STORE" "$PERSISTENT" /tmp/sched_status.sqlite* /tmp/lock /usr/zelo/etc/power_sched.conf
  cp "$SCRATCH/crontab" /etc/crontab
  rm -rf /usr/zelo/var
}

state_of_files() {
  cat "$STORE" "$PERSISTENT" /etc/crontab 2>&1 | sha256sum
}

leaves_all_as_it_was() {
  local before
  before=$(state_of_files)
  try "$@"
  same "$(state_of_files)" "$before" && [[ $status != 0 ]]
}

add() {
  z add --quiet "$@"
}

json() {
  python3 -c "import json, sys; tasks = json.load(sys.stdin); print($1)"
}

task_lines() {
  grep -c /tmp/zeloschedtask /etc/crontab || true
}

# ---- help, version, usage -------------------------------------------------------------------

every_command_has_help() {
  local name bad=0
  for name in $(z --help | sed -n 's/^  \([a-z-]*\) .*/\1/p'); do
    try z "$name" --help
    [[ $status == 0 && $out == "usage: zelosched $name "* && -z $err ]] || { echo "$name"; bad=1; }
  done
  return "$bad"
}

help_fits_the_terminal() {
  local name
  for name in $(z --help | sed -n 's/^  \([a-z-]*\) .*/\1/p'); do z "$name" --help; done |
    awk 'length > 90 && !/^usage/ { print; bad = 1 } END { exit bad }'
}

wrong_arguments_are_usage_errors() {
  local bad=0 line
  local -a words
  while read -r line; do
    read -ra words <<<"$line"
    try z "${words[@]}"
    [[ $status == "$USAGE" && -z $out && $err == *"usage: zelosched"* ]] ||
      { echo "[$line]: $status $err"; bad=1; }
  done <<'LINES'

nonsense
list --nonsense
list x
list --sort
list --sort nonsense
list -- x
show
show x
show -1
show 99999999999999999999
next --count 0
next --count x
history --limit -5
history 1 2
history --keep 1
history --keep --json
restore x
restore -- x
catch-up x
catch-up --within 12
catch-up --within 0h
catch-up --within 8d
status x
add
add --daily 08:30
add --daily 08:30 --
add -- true
add --daily 08:30 --once 2099-01-01T08:30 -- true
add --weekly mon -- true
add --daily 08:30 --until 18 -- true
add --daily 08:30 --overlap maybe -- true
add x --daily 08:30 -- true
edit
edit 1
edit 1 2 --daily 08:30
enable
disable x
remove
run
sync now
power
power nonsense
power add
power add on
power add up --daily 08:30
power add on --daily 08:30 --weekly mon 08:30
import
import a b
export x
completion
completion fish
LINES
  return "$bad"
}

# ---- saving ---------------------------------------------------------------------------------

saves_what_it_was_told() {
  clean
  add --weekly mon,wed,fri 08:30 --every 2h --until 18 --start 2031-01-06 --name Mirror \
    --owner nobody --app backup --app-name Backup --app-args 'a b' --action copies \
    --overlap yes --app-overlap no -- mirror --all >/dev/null
  same "$(z show 1 --json | json '[tasks[k] for k in ["type", "week", "run hour", "run min",
    "repeat hour", "last work hour", "start year", "start month", "start day", "name", "owner",
    "app", "app name", "app args", "action", "can run task same time", "can run app same time",
    "cmd", "state", "backend", "id"]]')" \
    "['weekly', '0101010', 8, 30, 2, 18, 2031, 1, 6, 'Mirror', 65534, 'backup', 'Backup', 'a b',\
 'copies', 1, 0, 'mirror --all', 'enabled', -2, 1]"
}

command_of() {
  z show "$1" --json | json 'tasks["cmd"]'
}

quotes_words() {
  clean
  add --daily 08:30 -- printf '%s|' 'a b' "it's" '$HOME' '' '*' >/dev/null
  same "$(sh -c "$(command_of 1)")" "a b|it's|\$HOME||*|"
}

takes_one_word_as_it_is() {
  clean
  add --daily 08:30 -- 'echo a; exit 3' >/dev/null
  same "$(command_of 1)" 'echo a; exit 3'
}

finds_owners() {
  clean
  add --daily 08:30 --owner nobody -- true >/dev/null
  add --daily 08:30 --owner 65534 -- true >/dev/null
  add --daily 08:30 -- true >/dev/null
  same "$(z list --json --sort id | json '[(t["owner"], t["owner name"]) for t in tasks]')" \
    "[(65534, 'nobody'), (65534, 'nobody'), (0, 'root')]"
}

edits_only_what_is_named() {
  clean
  add --weekly mon 08:30 --every 3h --name old --owner nobody -- 'echo one' >/dev/null
  z export 1 >"$SCRATCH/before"
  z edit 1 --name new >/dev/null
  z export 1 | sed 's/"name":"new"/"name":"old"/' | diff "$SCRATCH/before" - &&
    z edit 1 --daily 09:15 -- echo two >/dev/null &&
    same "$(z show 1 --json | json '[tasks[k] for k in ["name", "type", "run hour", "run min",
      "repeat hour", "owner", "cmd"]]')" "['new', 'daily', 9, 15, 3, 65534, 'echo two']"
}

respects_the_application() {
  clean
  add --daily 08:30 -- true >/dev/null
  z export | sed 's/"can \([a-z]*\) from ui":1/"can \1 from ui":0/g; s/"can edit \([a-z]*\)":1/"can edit \1":0/g' |
    z import - >/dev/null
  fails_saying 1 "does not let it be edited by hand" z edit 1 --daily 09:00 &&
    fails_saying 1 "does not let it be removed by hand" z remove 1 --yes &&
    fails_saying 1 "does not let it be run by hand" z run 1 &&
    z edit 1 --daily 09:00 --force >/dev/null && z run 1 --wait --force >/dev/null &&
    z disable 1 >/dev/null && z remove 1 --yes --force >/dev/null
}

does_the_others() {
  clean
  add --daily 08:30 -- true >/dev/null
  add --daily 08:30 -- true >/dev/null
  gives 1 "task 1 (Task 1) disabled
task 2 (Task 2) disabledzelosched: there is no task 9" disable 1 9 2 && same "$(task_lines)" 0 &&
    gives 1 "task 2 (Task 2) enabledzelosched: there is no task 9" enable 2 9 &&
    same "$(task_lines)" 1 && gives 0 "task 2 (Task 2) is enabled already" enable 2 &&
    gives 1 "task 1 (Task 1) removedzelosched: there is no task 9" remove --yes 9 1
}

refuses() {
  local bad=0
  clean
  add --daily 08:30 --name kept -- true >/dev/null
  while IFS='|' read -r part line; do
    local before
    before=$(state_of_files)
    eval "fails_saying 1 \"$part\" z $line" || { echo "$line"; bad=1; }
    same "$(state_of_files)" "$before" || { echo "changed by: $line"; bad=1; }
  done <<'LINES'
invalid hour 24 (00 to 23)|add --daily 24:00 -- true
invalid minute 60 (00 to 59)|add --daily 08:60 -- true
invalid last hour 24 (0 to 23)|add --daily 08:00 --every 2h --until 24 -- true
invalid day 32 (1 to 31)|add --monthly 32 08:30 -- true
invalid day 0 (1 to 31)|add --monthly 0 08:30 -- true
invalid month 13 (01 to 12)|add --yearly 13-01 08:30 -- true
month 4 never has a day 31|add --yearly 04-31 08:30 -- true
month 2 never has a day 30 in 2099|add --once 2099-02-30T08:30 -- true
needs a day of the week|add --weekly none 08:30 -- true
is before the first|add --daily 08:00 --every 2h --until 7 -- true
there is no user 'no such user'|add --owner 'no such user' --daily 08:30 -- true
there is no user '4000000000'|add --owner 4000000000 --daily 08:30 -- true
has an apostrophe|add --app "Bob's" --daily 08:30 -- true
is over: write a later date|add --once 2001-01-01T08:30 -- true
shorten it to 4095|add --name $(printf %04096d 0) --daily 08:30 -- true
shorten it to 1023|add --app $(printf %01024d 0) --daily 08:30 -- true
only 12287 can be stored|add --daily 08:30 -- $(printf %012288d 0)
invalid hour 99 (00 to 23)|edit 1 --daily 99:00
is over: write a later date|edit 1 --once 2001-01-01T08:30
has an apostrophe|edit 1 --app "'"
there is no task 7|edit 7 --daily 08:30
there is no task 7|enable 7
there is no task 7|remove --yes 7
invalid hour 24 (00 to 23)|power add on --daily 24:00
needs a day of the week|power add off --weekly none 08:30
the start date 2027-13-01 does not exist|add --daily 08:30 --start 2027-13-01 -- true
the start date 2027-02-31 does not exist|add --weekly mon 08:30 --start 2027-02-31 -- true
the start date 2027-02-31 does not exist|add --monthly 31 08:30 --start 2027-02-31 -- true
the name has a line feed|add --name $'a\nb' --daily 08:30 -- true
the action has a line feed|edit 1 --action $'a\nb'
LINES
  return "$bad"
}

refuses_import_as_a_whole() {
  clean
  add --daily 08:30 --name kept -- true >/dev/null
  z export >"$SCRATCH/tasks"
  local edit bad=0
  for edit in 's/"run hour":8/"run hour":24/' 's/"state":"enabled"/"state":"asleep"/' \
    's/"name":"kept",//' 's/"run min":30/"run min":"x"/' 's/"run min":30/"run min":3.5/' \
    's/"owner":0/"owner":4000000000/' 's/"app":""/"app":"'\''"/' 's/"name":"kept"/"name":[]/' \
    's/"name":"kept"/"name":"a\\u0000b"/' 's/"week":"1111111"/"week":"11111111"/' \
    's/"owner":0/"owner":4294967296/' 's/"id":1/"id":4294967297/' 's/"run hour":8/"run hour":4294967304/' \
    's/"start year":0/"start year":4294969323/' 's/"owner":0/"owner":-1/' 's/"start day":0/"start day":32/' \
    's/"name":"kept"/"name":"a\\nb"/' 's/"cmd":"true"/"cmd":" "/' 's/"cmd":"true"/"cmd base64":"AA=="/' \
    's/"cmd":"true"/"cmd":"true","cmd base64":"dHJ1ZQ=="/' "s/\"cmd\":\"true\"/\"cmd\":\"$(printf %012288d 0)\"/" \
    's/"type":"daily"/"type":"monthly"/;s/"start day":0/"start day":1/;s/"start month":0/"start month":99/' \
    's/"type":"daily"/"type":"monthly"/;s/"start day":0/"start day":1/;s/"start year":0/"start year":10000/' \
    's/"start year":0/"start year":4294967295/' \
    's/"type":"daily"/"type":"once"/;s/"start day":0,//' 's/"type":"daily"/"type":"weekly"/;s/,"week":"1111111"//'; do
    { echo "[$(sed '1d;$d' "$SCRATCH/tasks"),"; sed '1d;$d' "$SCRATCH/tasks" | sed "$edit"; echo "]"; } >"$SCRATCH/bad"
    leaves_all_as_it_was z import "$SCRATCH/bad" || { echo "saved: $edit"; bad=1; }
    [[ $err == *"object 2 of 2: "*"nothing was imported: 1 object of 2"* ]] || { echo "$edit: $err"; bad=1; }
  done
  return "$bad"
}

imports_power_times_whole_or_not_at_all() {
  clean
  z power add on --daily 07:00 >/dev/null && z power add off --daily 23:00 >/dev/null
  z export >"$SCRATCH/power"
  local edit bad=0
  add --daily 08:30 -- true >/dev/null
  for edit in '' 's/"run hour":7/"run hour":6/;s/"app args":"poweroff"/"app args":"sideways"/' \
    's/"run hour":7/"run hour":6/;s/"run hour":23/"run hour":6/;s/poweroff/poweron/'; do
    { echo "[$(z export 1 | sed '1d;$d'),"; sed '1d;$d' "$SCRATCH/power" | sed "$edit"; echo "]"; } >"$SCRATCH/bad"
    local before
    before=$(z list | sort)
    try z import --new "$SCRATCH/bad"
    [[ $status == 1 && $err == *"nothing was imported"* && $(z list | sort) == "$before" ]] ||
      { echo "$edit: $status $out $err"; bad=1; }
  done
  sed '1d;$d' "$SCRATCH/power" | grep poweron | sed 's/,$//' >"$SCRATCH/on"
  { echo "["; for i in {1..104}; do sed "s/\"run hour\":7/\"run hour\":$((i / 60))/;s/\"run min\":0/\"run min\":$((i % 60))/" "$SCRATCH/on"; echo ","; done; cat "$SCRATCH/on"; echo "]"; } |
    tr '\n' ' ' >"$SCRATCH/many"
  fails_saying 1 "no more fit" z import --new "$SCRATCH/many" || bad=1
  return "$bad"
}

# times COUNT: an array with so many of the object that is read
times() {
  local object
  object=$(cat)
  echo "["
  yes "$object," | head -n "$(($1 - 1))"
  echo "$object]"
}

# More is said of them than is written at once.
imports_to_the_end_when_the_reader_is_gone() {
  clean
  add --daily 08:30 --name "$(printf %0200d 0)" -- true >/dev/null
  z export 1 | sed '1d;$d' | times 61 >"$SCRATCH/many"
  { z import --new "$SCRATCH/many" 2>/dev/null || true; } | true
  same "$(task_lines)" 62
}

# The library would take another day of its own.
an_import_without_its_day_is_refused() {
  local type key bad=0
  clean
  add --daily 08:30 -- true >/dev/null
  z export 1 | sed 's/"start year":0/"start year":2099/;s/"start month":0/"start month":1/;s/"start day":0/"start day":1/' >"$SCRATCH/day"
  while read -r type key; do
    sed "s/\"type\":\"daily\"/\"type\":\"$type\"/;s/\"$key\":[^,}]*,*//" "$SCRATCH/day" >"$SCRATCH/without"
    leaves_all_as_it_was z import --new "$SCRATCH/without" || bad=1
    [[ $err == *"object 1 of 1: \"$key\" is missing"* ]] || { echo "$type without $key: $err"; bad=1; }
  done <<'KEYS'
once start year
once start month
once start day
weekly week
monthly start day
yearly start month
yearly start day
KEYS
  return "$bad"
}

an_empty_import_is_told() {
  clean
  fails_saying 1 "it holds no task" z import /dev/null && echo "[]" >"$SCRATCH/no_task" &&
    gives 0 "there is no task to import" import "$SCRATCH/no_task" &&
    printf '[{"a":1},\n{"b":2},\n{"c":}]\n' >"$SCRATCH/broken" &&
    fails_saying 1 "it is no JSON: Line 3" z import "$SCRATCH/broken"
}

imports_what_it_exports() {
  clean
  add --daily 08:30 --name 'größe "漢字" \ é' -- $'echo a\nb\xff' >/dev/null
  add --weekly sun 23:59 --disabled --owner nobody -- true >/dev/null
  z export >"$SCRATCH/plain"
  z export --wire >"$SCRATCH/wire"
  local form
  for form in plain wire; do
    clean
    z import - <"$SCRATCH/$form" >/dev/null || return 1
    z export | diff "$SCRATCH/plain" - || return 1
  done
}

imports_one_object_or_lines() {
  clean
  add --daily 08:30 -- true >/dev/null
  z export | sed '1d;$d' >"$SCRATCH/one"
  gives 0 "task 1 (Task 1) overwritten" import "$SCRATCH/one" &&
    { cat "$SCRATCH/one"; echo; sed 's/Task 1/other/' "$SCRATCH/one"; } >"$SCRATCH/two" &&
    gives 0 "task 1 (Task 1) overwritten
task 2 (other) added" import "$SCRATCH/two" &&
    gives 0 "task 3 (Task 1) added" import --new "$SCRATCH/one"
}

agrees_with_the_library_on_the_wire_form() {
  clean
  add --daily 08:30 --name 'a"b' -- true >/dev/null
  same "$(z export --wire | json 'tasks["name"]' | json 'tasks')" 'a"b'
}

twenty_at_once() {
  clean
  local i
  for i in {1..20}; do z add --daily 08:30 --name "n$i" -- true >/dev/null & done
  wait
  same "$(z list --json | json 'len({t["name"] for t in tasks})')" 20 && same "$(task_lines)" 20 &&
    for i in {1..20}; do z edit 1 "--$([[ $((i % 2)) == 0 ]] && echo action || echo app-args)" "v$i" >/dev/null & done
  wait
  for i in {1..20}; do z disable "$i" >/dev/null & done
  wait
  same "$(z list --json --enabled)" "$(printf '[\n]')"
}

# The crontab that works is better than one that cron may pass over.
writes_no_line_that_cron_cannot_read() {
  all_well
  add --daily 09:30 -- true >/dev/null
  sed -i '0,/^run hour=.*/s//run hour="25"/' "$STORE"
  local before
  before=$(cat /etc/crontab)
  fails_saying 1 "invalid hour 25 (00 to 23)" z sync && same "$(cat /etc/crontab)" "$before" &&
    sed -i '/zeloschedtask/d' /etc/crontab && try z status &&
    [[ $out == *"once no task has a field that cron cannot read"* ]]
}

# Another program has saved the hour, so that the crontab has it only after the next change.
spoil_the_hour_of_the_first() {
  sed -i '0,/^run hour=.*/s//run hour="25"/' "$STORE"
}

no_change_writes_a_line_that_cron_cannot_read() {
  local command bad=0
  all_well
  add --daily 09:30 -- true >/dev/null
  add --daily 10:30 --disabled -- true >/dev/null
  z export 2 >"$SCRATCH/one"
  spoil_the_hour_of_the_first
  for command in 'add --daily 10:30 -- true' 'edit 2 --daily 11:30' 'disable 2' 'enable 3' 'remove --yes 3' \
    "import $SCRATCH/one" "import --new $SCRATCH/one"; do
    # shellcheck disable=SC2086
    leaves_all_as_it_was z $command || { echo "changed by: $command"; bad=1; }
    [[ $err == *"nothing was saved, as cron may then pass over all of /etc/crontab: task 1 (Task 1): invalid hour 25 (00 to 23)"*"or disable the task"* ]] ||
      { echo "$command: $err"; bad=1; }
  done
  z power add off --daily 23:00 >/dev/null || bad=1
  return "$bad"
}

# One after the other; each but the last is mended beside another one.
a_task_that_cron_cannot_read_can_be_changed() {
  all_well
  add --daily 09:30 -- true >/dev/null
  add --daily 10:30 -- true >/dev/null
  sed -i 's/^run hour=.*/run hour="25"/' "$STORE"
  z disable 1 >/dev/null && z remove --yes 2 >/dev/null && z edit 3 --daily 09:30 >/dev/null &&
    gives 0 "the crontab is in step with the tasks" sync && same "$(task_lines)" 1
}

# Comments count like any other line. Of more than 10,000 lines cron reads none, and 200 are left to
# other programs and to power times.
fill_crontab() {
  local lines=$1 present
  present=$(wc -l </etc/crontab)
  yes '#' | head -n $((lines - present)) >>/etc/crontab
}

readonly TOO_LONG="not saved: /etc/crontab would have more than 9800 lines, and cron ignores all of it when there are more than 10000: remove or disable tasks first"

no_change_makes_the_crontab_too_long() {
  local command bad=0
  all_well
  add --daily 09:30 --disabled -- true >/dev/null
  z export 1 >"$SCRATCH/one"
  z export 2 | sed 's/"disabled"/"enabled"/' >"$SCRATCH/enabled"
  fill_crontab 9800
  for command in 'add --daily 10:30 -- true' 'enable 2' "import --new $SCRATCH/one" "import $SCRATCH/enabled"; do
    # shellcheck disable=SC2086
    leaves_all_as_it_was z $command || { echo "changed by: $command"; bad=1; }
    [[ $err == *"$TOO_LONG"* ]] || { echo "$command: $err"; bad=1; }
  done
  return "$bad"
}

# All of a file together: not some, until there is no more room.
an_import_that_would_make_the_crontab_too_long_saves_nothing() {
  all_well
  add --daily 09:30 -- true >/dev/null
  z export >"$SCRATCH/two"
  fill_crontab 9799
  leaves_all_as_it_was z import --new "$SCRATCH/two" && [[ $err == *"$TOO_LONG"* ]] &&
    z import "$SCRATCH/two" >/dev/null && z disable 1 >/dev/null &&
    z import --new "$SCRATCH/two" >/dev/null && same "$(task_lines) $(wc -l </etc/crontab)" "3 9800"
}

what_adds_no_line_is_saved_beside_a_full_crontab() {
  all_well
  add --daily 09:30 --disabled -- true >/dev/null
  z export >"$SCRATCH/two"
  fill_crontab 9900
  z edit 1 --daily 10:30 >/dev/null && z edit 2 --daily 11:30 >/dev/null &&
    add --daily 12:30 --disabled -- true >/dev/null && z import "$SCRATCH/two" >/dev/null &&
    z power add off --daily 23:00 >/dev/null && z sync >/dev/null && z remove --yes 3 >/dev/null &&
    z disable 1 >/dev/null && same "$(task_lines) $(wc -l </etc/crontab)" "0 9900"
}

arms_the_clock_beside_a_task_that_cron_cannot_read() {
  all_well
  z power add on --daily 07:00 >/dev/null
  spoil_the_hour_of_the_first
  : >/sys/class/rtc/rtc0/wakealarm
  fails_saying 1 "the crontab was not written" z sync && [[ -s /sys/class/rtc/rtc0/wakealarm ]]
}

writes_the_tasks_beside_a_damaged_power_list() {
  all_well
  z power add off --daily 23:00 >/dev/null
  sed -i '/zeloschedtask/d' /etc/crontab
  truncate -s 30 /usr/zelo/etc/power_sched.conf
  try z sync
  local result=$((status == 1 ? 0 : 1))
  [[ $err == *"cannot list the tasks"* ]] && same "$(task_lines)" 1 || result=1
  rm /usr/zelo/etc/power_sched.conf
  return "$result"
}

arms_the_clock_beside_tasks_that_are_not_there() {
  all_well
  z power add on --daily 07:00 >/dev/null
  : >/sys/class/rtc/rtc0/wakealarm
  truncate -s 100 "$STORE"
  fails_saying 1 "cannot list the tasks" z sync && [[ -s /sys/class/rtc/rtc0/wakealarm ]]
}

tells_of_a_clock_that_is_not_armed() {
  all_well
  local alarm=/sys/class/rtc/rtc0/wakealarm result=0
  z power add on --daily 07:00 >/dev/null && try z status && [[ $out != *"not armed for"* ]] || return 1
  : >"$alarm"
  try z status
  [[ $out == *"warning   the machine's clock is not armed for the next power-on time"* ]] || result=1
  rm "$alarm"
  try z status
  [[ $out == *"warning   the machine has no clock that could be armed"* ]] || result=1
  fails_saying_of_all "the machine has no clock" z sync || result=1
  touch "$alarm"
  gives 0 "the crontab is in step with the tasks" sync && return "$result"
}

# Of one that does some of its work.
fails_saying_of_all() {
  local part=$1
  shift
  try "$@"
  [[ $status == 1 && $err == *"$part"* ]] || { echo "$status: $out$err"; return 1; }
}

# answer_after COMMAND... -- ARGUMENTS...: "yes" to zelosched ARGUMENTS, when COMMAND has run since the
# question
answer_after() {
  python3 - "$ZELOSCHED" "$@" <<'PTY'
import os, pty, subprocess, sys
zelosched, *words = sys.argv[1:]
dashes = words.index("--")
pid, terminal = pty.fork()
if pid == 0:
    os.execv(zelosched, [zelosched, *words[dashes + 1:]])
seen = b""
while b"[y/N]" not in seen:
    seen += os.read(terminal, 1024)
subprocess.run(words[:dashes], check=True)
os.write(terminal, b"y\n")
try:
    while chunk := os.read(terminal, 1024):
        seen += chunk
except OSError:
    pass
print(seen.decode(), os.waitstatus_to_exitcode(os.waitpid(pid, 0)[1]))
PTY
}

replace_the_second() {
  z remove --yes 2 && z add --daily 10:30 --name precious -- true
}

nothing_but_what_was_shown_is_removed() {
  clean
  add --daily 08:30 --name first -- true >/dev/null
  add --daily 09:30 --name shown -- true >/dev/null
  export -f replace_the_second z
  export ZELOSCHED
  answer_after bash -c replace_the_second -- remove 2 >"$SCRATCH/log"
  grep -q "stays: it has been changed meanwhile" "$SCRATCH/log" &&
    same "$(z list --sort id --json | json '[t["name"] for t in tasks]')" "['first', 'precious']"
}

# Which renames the ones after it.
eight_power_times_are_removed_at_once() {
  clean
  local hour ids
  for hour in {1..8}; do z power add on --daily "0$hour:00" >/dev/null; done
  ids=$(z power list --json | json '" ".join(str(t["id"]) for t in tasks)')
  local id bad=0
  local -a removals=()
  for id in $ids; do
    z power remove --yes "$id" >/dev/null 2>>"$SCRATCH/log" &
    removals+=($!)
  done
  for id in "${removals[@]}"; do wait "$id" || bad=1; done
  same "$bad $(ids_of_list)" "0 []"
}

# The power time that is asked about moves up in the list meanwhile.
a_power_time_that_was_shown_is_removed() {
  clean
  z power add on --daily 01:00 >/dev/null
  z power add on --daily 02:00 >/dev/null
  answer_after "$ZELOSCHED" power remove --yes 71270100 -- remove 71270200 >"$SCRATCH/log" &&
    grep -q "removed" "$SCRATCH/log" && same "$(ids_of_list)" "[]"
}

next_of_several_tells_what_is_missing() {
  clean
  add --daily 08:30 -- true >/dev/null
  try z next 1 99
  [[ $status == 1 && $out == *"Task 1"* && $err == *"there is no task 99"* ]]
}

next_of_many_is_quick() {
  clean
  add --daily 08:30 -- true >/dev/null
  z export 1 | sed '1d;$d' | times 401 | awk '{ sub(/"run min":30/, "\"run min\":" NR % 60); print }' >"$SCRATCH/many"
  z import --new "$SCRATCH/many" >/dev/null
  same "$(timeout 20 "$ZELOSCHED" next --count 10000 --json | json 'len(tasks)')" 10000 &&
    same "$("$ZELOSCHED" next --count 5 --json | json '[t["run"][11:13] for t in tasks]')" "['08', '08', '08', '08', '08']"
}

next_beside_rare_tasks_is_quick() {
  clean
  for day in 1 2 3; do add --yearly "01-0$day" 08:30 -- true >/dev/null; done
  add --daily 00:15 --every 1h -- true >/dev/null
  same "$(timeout 20 "$ZELOSCHED" next --count 10000 --json | json 'len(tasks)')" 10000
}

a_minute_that_never_comes_is_told() {
  TZ=CET-1CEST,M3.5.0,M10.5.0/3 fails_saying 1 "does not come, as the clocks go forward" \
    z add --once 2099-03-29T02:30 -- true
}

# ---- looking --------------------------------------------------------------------------------

three_tasks() {
  clean
  add --daily 08:30 --name later -- true >/dev/null
  add --daily 07:30 --name sooner --app backup --owner nobody -- true >/dev/null
  add --daily 06:30 --name off --disabled -- true >/dev/null
}

lists_by_next_run() {
  three_tasks
  same "$(at '2026-11-21 07:00' list)" \
    "ID  STATE     TYPE   NEXT RUN          OWNER   LAST RESULT  NAME
 2  enabled   daily  2026-11-21 07:30  nobody  -            sooner
 1  enabled   daily  2026-11-21 08:30  root    -            later
 3  disabled  daily  -                 root    -            off"
}

ids_of_list() {
  z list --json "$@" | json '[t["id"] for t in tasks]'
}

lists_chosen_tasks() {
  three_tasks
  same "$(ids_of_list --app backup) $(ids_of_list --enabled --sort id)" "[2] [1, 2]" &&
    z export 3 | sed 's/"listable":1/"listable":0/' | z import - >/dev/null &&
    same "$(ids_of_list --sort id) $(ids_of_list --all --sort id)" "[1, 2] [1, 2, 3]"
}

sorts() {
  three_tasks
  local key found=""
  for key in id name state type owner app result; do found+="$key $(ids_of_list --sort "$key") "; done
  same "$found$(ids_of_list --sort name --reverse)" "id [1, 2, 3] name [1, 3, 2] state [1, 2, 3]\
 type [1, 2, 3] owner [2, 1, 3] app [1, 3, 2] result [1, 2, 3] [2, 3, 1]"
}

shows_a_task() {
  three_tasks
  same "$(at '2026-11-21 07:00' show 2)" "          ID: 2
        Name: sooner
       State: enabled
        Runs: daily at 07:30
    Next run: 2026-11-21 07:30
    Last run: none is recorded
       Owner: nobody (65534)
     Command: true
         App: backup
  Runs of it: must not overlap another run of it, may overlap others of its application"
}

shows_the_coming_runs() {
  three_tasks
  same "$(at '2026-11-21 08:00' next --count 3)" "2026-11-21 Saturday
  08:30  1  later

2026-11-22 Sunday
  07:30  2  sooner
  08:30  1  later" &&
    same "$(at '2026-11-21 08:00' next 2 --count 1 --json | json 'tasks')" \
      "[{'id': 2, 'name': 'sooner', 'run': '2026-11-22 07:30'}]" &&
    fails_saying 0 "task 3 (off) is disabled" z next 3 &&
    fails_saying 1 "there is no task 9" z next 9
}

aligns_ids() {
  clean
  add --daily 08:30 -- true >/dev/null
  z power add on --daily 07:30 >/dev/null
  same "$(at '2026-11-21 07:00' next --count 2)" "2026-11-21 Saturday
  07:30  71270730  PowerOn task 0
  08:30         1  Task 1"
}

sorts_a_far_year_last() {
  clean
  add --weekly mon 08:30 --start 9999-12-31 -- true >/dev/null
  add --daily 08:30 -- true >/dev/null
  same "$(ids_of_list)" "[2, 1]" && [[ $(z list | tail -1) == *10000-01-03* ]]
}

shows_a_start_from_the_beginning_of_a_year() {
  all_well
  sed -i 's/^start year=.*/start year="2098"/' "$STORE" "$PERSISTENT"
  [[ $(z show 1) == *"From: 2098-01-01 on"*"Next run: 2098-01-01 08:30"* ]] && z edit 1 --name b >/dev/null &&
    gives 0 "task 1 (b) disabled" disable 1 && gives 0 "task 1 (b) enabled" enable 1
}

looking_makes_it_roots_alone() {
  three_tasks
  try z status
  z list >/dev/null && z show 1 >/dev/null && z history >/dev/null &&
    same "$(stat -c '%U %a' /tmp/sched_status.sqlite)" "root 600"
}

# ---- running --------------------------------------------------------------------------------

runs_and_tells_the_result() {
  clean
  add --daily 08:30 --name good --disabled -- 'exit 0' >/dev/null
  add --daily 08:30 --name bad -- 'exit 3' >/dev/null
  add --daily 08:30 --name killed -- 'kill -9 $$' >/dev/null
  gives 0 "task 1 (good) finished" run --wait 1 &&
    gives 1 "zelosched: task 2 (bad) failed with exit code 3" run --wait 2 &&
    gives 1 "zelosched: task 3 (killed) killed by signal SIGKILL (9)" run --wait 3 &&
    gives 1 "task 1 (good) finishedzelosched: there is no task 9" run --wait 9 1
}

waits_for_its_own_run_only() {
  clean
  add --daily 08:30 --overlap yes -- 'sleep 0.3; exit 4' >/dev/null
  add --daily 08:30 --overlap yes -- 'sleep 300 & exit 0' >/dev/null
  z run 1 >/dev/null
  gives 0 "task 2 (Task 2) finished" run --wait 2 &&
    gives 1 "zelosched: task 1 (Task 1) failed with exit code 4" run --wait 1
}

lets_the_run_go_on() {
  clean
  rm -f "$SCRATCH/ran"
  add --daily 08:30 -- "read x <$SCRATCH/fifo; echo ran >$SCRATCH/ran" >/dev/null
  rm -f "$SCRATCH/fifo"
  mkfifo "$SCRATCH/fifo"
  # With a pipe that the run would hold open, this would not end.
  same "$(z run 1)" "task 1 (Task 1) started" || return 1
  echo go >"$SCRATCH/fifo"
  until [[ -s $SCRATCH/ran ]]; do :; done
}

shows_the_output_when_told_to() {
  clean
  add --daily 08:30 -- 'echo said; echo complained >&2' >/dev/null
  gives 0 "task 1 (Task 1) finished" run --wait 1 &&
    gives 0 "said
complained
task 1 (Task 1) finished" run --output 1
}

# fails_in_run_of EXIT_CODE ID: what the run prints, which a shell could not hold, is in a file.
fails_in_run_of() {
  local status=0
  z run --output "$2" >"$SCRATCH/out" 2>"$SCRATCH/err" || status=$?
  same "$status: $(cat "$SCRATCH/err")" "1: zelosched: task $2 (Task $2) failed with exit code $1"
}

passes_output_on_unchanged() {
  clean
  add --daily 08:30 -- 'printf "\033[1m\303\0\r\n\377"; exit 3' >/dev/null
  printf '\033[1m\303\0\r\n\377' >"$SCRATCH/wanted"
  fails_in_run_of 3 1 && cmp "$SCRATCH/out" "$SCRATCH/wanted"
}

output_does_not_wait_for_a_daemon() {
  clean
  add --daily 08:30 -- 'sleep 1000 & echo said' >/dev/null
  add --daily 08:30 -- 'yes & exit 4' >/dev/null
  gives 0 "said
task 1 (Task 1) finished" run --output 1 || return 1
  fails_in_run_of 4 2
}

streams_output() {
  clean
  add --daily 08:30 -- 'head -c 1000000000 /dev/zero' >/dev/null
  local counts
  counts=$(python3 -c '
import resource, subprocess, sys
run = subprocess.Popen(sys.argv[1:], stdout=subprocess.PIPE)
size = 0
while part := run.stdout.read(1 << 20):
    size += len(part)
status = run.wait()
print(status, size, resource.getrusage(resource.RUSAGE_CHILDREN).ru_maxrss < 100 << 10)
' timeout 60 "$ZELOSCHED" run --output 1)
  same "$counts" "0 $((1000000000 + $(printf 'task 1 (Task 1) finished\n' | wc -c))) True"
}

goes_on_when_the_reader_is_gone() {
  clean
  rm -f "$SCRATCH/ran" "$SCRATCH/fifo"
  mkfifo "$SCRATCH/fifo"
  add --daily 08:30 -- "echo said; read go <$SCRATCH/fifo; seq 100000 && echo ran >$SCRATCH/ran" >/dev/null
  z run --output 1 2>"$SCRATCH/err" | head -n 1 >"$SCRATCH/first" &
  local pipeline=$!
  echo go >"$SCRATCH/fifo"
  wait "$pipeline" || true
  same "$(cat "$SCRATCH/first" "$SCRATCH/err")" said || return 1
  until [[ -s $SCRATCH/ran ]]; do :; done
}

tells_of_output_that_cannot_be_written() {
  clean
  add --daily 08:30 -- "seq 100000; echo ran >$SCRATCH/ran" >/dev/null
  local full=0 closed=0
  rm -f "$SCRATCH/ran"
  z run --output 1 >/dev/full 2>"$SCRATCH/full" || full=$?
  test -s "$SCRATCH/ran" || return 1
  z run --output 1 >&- 2>"$SCRATCH/closed" || closed=$?
  local said="zelosched: task 1 (Task 1) finished, and what it printed could not be written:"
  same "$full $(cat "$SCRATCH/full")" "1 $said No space left on device" &&
    same "$closed $(cat "$SCRATCH/closed")" "1 $said Bad file descriptor"
}

leaves_input_to_its_caller() {
  clean
  add --daily 08:30 --overlap yes -- "cat >>$SCRATCH/eaten; exit 0" >/dev/null
  local way
  rm -f "$SCRATCH/eaten"
  for way in '' --wait --output; do
    # shellcheck disable=SC2086
    same "$(printf 'a\nb\n' | while read -r line; do z run $way 1 >/dev/null; echo "$line"; done)" $'a\nb' ||
      return 1
  done
  test ! -s "$SCRATCH/eaten"
}

an_owner_may_name_the_output() {
  clean
  add --daily 08:30 --owner nobody -- \
    'echo said >/dev/stdout; echo complained >/dev/stderr; (head -c 1 </dev/stdout) 2>/dev/null && echo read; exit 0' >/dev/null
  gives 0 "said
complained
task 1 (Task 1) finished" run --output 1
}

tells_that_a_run_gave_up() {
  clean
  add --daily 08:30 -- true >/dev/null
  z run --wait 1 >/dev/null
  python3 -c 'import sqlite3, sys
with sqlite3.connect("/tmp/sched_status.sqlite") as database:
    database.execute("UPDATE task_status SET status_code=2, pid=?", [int(sys.argv[1])])' $$
  FAKE_PATIENCE=1 LD_PRELOAD=$FAKE try z run --wait 1
  same "$status: $err" "1: zelosched: task 1 (Task 1) gave up waiting"
}

has_its_turn_whatever_is_in_the_way() {
  clean
  add --daily 08:30 -- true >/dev/null
  rm -r /tmp/lock
  touch /tmp/lock # where a directory should be
  try z run --wait 1
  same "$status: $out $(stat -c %F /tmp/lock)" "0: task 1 (Task 1) finished directory"
}

tells_that_a_run_died() {
  clean
  add --daily 08:30 -- 'kill -9 $PPID' >/dev/null
  gives 1 "zelosched: task 1 (Task 1) was running but its process is gone" run --wait 1 &&
    same "$(z history --json | json 'tasks["runs"][0]["outcome"]')" "lost"
}

keeps_history() {
  clean
  add --daily 08:30 --name one -- 'exit 3' >/dev/null
  add --daily 08:30 --name two -- true >/dev/null
  z run --wait 1 2>/dev/null || true
  z run --wait 2 >/dev/null
  z remove --yes 2 >/dev/null
  rm -r /usr/zelo/var
  sqlite3 /tmp/sched_status.sqlite "UPDATE task_status SET timestamp = 1795161600 + status_id"
  same "$(z history)" "START                DURATION  RUN  TASK  OUTCOME                  NAME
2026-11-20 08:00:02         -    2     2  finished                 -
2026-11-20 08:00:01         -    1     1  failed with exit code 3  one" &&
    same "$(z history 1 --json | json '[(r["task"], r["outcome"], r["exit_code"], r["start"][:19])
      for r in tasks["runs"]]')" "[(1, 'failed', 3, '2026-11-20T08:00:01')]" &&
    same "$(z history --limit 1 | wc -l)" 2 &&
    same "$(z list | awk '/one/ { print $7, $8, $9, $10, $11 }')" "failed with exit code 3"
}

shows_how_long_a_run_goes_on() {
  clean
  add --daily 08:30 -- true >/dev/null
  z run --wait 1 >/dev/null
  rm -r /usr/zelo/var
  sqlite3 /tmp/sched_status.sqlite "UPDATE task_status SET status_code = 2, pid = $$, timestamp = 1795161600"
  same "$(at '2026-11-20 09:01:05' history | tail -1)" \
    "2026-11-20 08:00:00   1:01:05    1     1  running  Task 1" &&
    same "$(z status | grep running | tail -1)" \
      "ok        task 1 (Task 1) is running since 2026-11-20 08:00 as process $$"
}

# ---- power ----------------------------------------------------------------------------------

have_clock() {
  mount -t tmpfs sys /sys && mkdir -p /sys/class/rtc/rtc0 && touch /sys/class/rtc/rtc0/wakealarm
}

looks_after_power_times() {
  clean
  gives 0 "power on daily at 07:30: task 71270730" power add on --daily 07:30 &&
    gives 0 "80622300" power add off --weekly mon-fri 23:00 --disabled --quiet &&
    same "$(at '2026-11-21 12:00' power list)" \
      "      ID  POWER  STATE     NEXT              WHEN
71270730  on     enabled   2026-11-22 07:30  daily at 07:30
80622300  off    disabled  -                 weekly on Mon, Tue, Wed, Thu and Fri at 23:00" &&
    gives 0 "task 90622300 (Poweroff 0) enabled
it was task 80622300 before" enable 80622300 &&
    grep -q $'^0\t23\t.*zelo_poweroff_feasible_check' /etc/crontab &&
    gives 1 "zelosched: there is such a power time already: it is task 71270730" \
      power add on --daily 07:30 &&
    gives 0 "task 71270800 (Poweron 0) saved: daily at 08:00" edit 71270730 --daily 08:00 &&
    fails_saying "$USAGE" "only --daily and --weekly" z edit 71270800 --name x --daily 09:00 &&
    fails_saying 1 "does not let it be run by hand" z run 71270800 &&
    gives 0 "task 71270800 (Poweron 0) removed" power remove --yes 71270800
}

power_remove_refuses_other_tasks() {
  clean
  add --daily 08:30 -- true >/dev/null
  fails_saying 1 "is no power time" z power remove --yes 1 && same "$(ids_of_list)" "[1]"
}

power_lists_are_bounded() {
  clean
  { echo '[poweron]'; printf 'times="'; for i in {0..99}; do printf '0 127 %d %d;' $((i / 60)) $((i % 60)); done |
    sed 's/;$//'; echo '"'; } >/usr/zelo/etc/power_sched.conf
  fails_saying 1 "there are 100 power-on times already" z power add on --daily 23:00 &&
    z enable 61270000 >/dev/null && z disable 71270000 >/dev/null &&
    gives 0 "task 61270500 (Poweron 0) saved: daily at 05:00" edit 61270000 --daily 05:00 &&
    z export 61270500 >"$SCRATCH/edited" && sed -i 's/"run hour":5/"run hour":6/' "$SCRATCH/edited" &&
    z import "$SCRATCH/edited" >/dev/null && same "$(z power list | grep -c ' on ')" 100 &&
    sed -i 's/"run hour":6/"run hour":7/' "$SCRATCH/edited" &&
    fails_saying 1 "there are 100 power-on times already" z import --new "$SCRATCH/edited" &&
    gives 0 "91272300" power add off --daily 23:00 --quiet
}

exports_power_times() {
  clean
  z power add on --daily 07:30 >/dev/null
  z export >"$SCRATCH/power"
  z power remove --yes 71270730 >/dev/null
  z import "$SCRATCH/power" >/dev/null && same "$(ids_of_list)" "[71270730]"
}

tells_of_a_clock_that_fails() {
  clean
  rm /sys/class/rtc/rtc0/wakealarm
  fails_saying 1 "it is stored all the same" z power add on --daily 07:30
  local result=$?
  touch /sys/class/rtc/rtc0/wakealarm
  [[ $result == 0 ]] && z sync >/dev/null && [[ -s /sys/class/rtc/rtc0/wakealarm ]]
}

# ---- status and sync ------------------------------------------------------------------------

start_something_like_cron() {
  cp /bin/sleep "$SCRATCH/cron"
  # No child of this shell, which waits for its own, and deaf to the library's signal.
  (
    trap '' HUP
    "$SCRATCH/cron" 1000 >/dev/null 2>&1 &
    echo $! >/var/run/crond.pid
  )
}

all_well() {
  clean
  add --daily 08:30 -- true >/dev/null
  install -m 0755 "$BUILD_DIR/bin/zeloschedtask" /tmp/zeloschedtask
}

status_is_well() {
  all_well
  rm -rf /tmp/zeloscheduler.*
  gives 0 "ok        cron is running (process $(cat /var/run/crond.pid))
ok        /tmp/zeloschedtask is there, and root's
ok        the working and the persistent copy of the tasks agree
ok        /tmp is root's, and sticky
ok        no other user is in the way of a run
ok        changes of tasks have their turn
ok        the crontab is in step with the tasks
ok        no enabled task has a fault
ok        no run was missed
ok        no power-on time waits for a clock that is not armed
ok        no task is running" status
}

# What to do to a machine on which all is well, and what status then says.
status_finds() {
  local part=$1 damage=$2
  all_well
  local pid
  pid=$(cat /var/run/crond.pid)
  eval "$damage"
  try z status
  echo "$pid" >/var/run/crond.pid
  rm -rf /tmp/zeloschedtask
  local worst=1
  [[ $out != *"critical  "* ]] || worst=4
  [[ $status == "$worst" && $out == *"$part"* ]] || { echo "$damage: $status $out $err"; return 1; }
}

readonly -a DAMAGES=(
  'critical  cron is not running' 'rm /var/run/crond.pid'
  'critical  cron is not running' 'echo $$ >/var/run/crond.pid'
  'critical  cron is not running' 'echo 99999999 >/var/run/crond.pid'
  'critical  cron is not running' 'echo nonsense >/var/run/crond.pid'
  'critical  /tmp/zeloschedtask, which cron starts, cannot be examined: No such file' 'rm /tmp/zeloschedtask'
  'critical  /tmp/zeloschedtask is no program' 'ln -sf /bin/true /tmp/zeloschedtask'
  'critical  /tmp/zeloschedtask is no program' 'chmod 0644 /tmp/zeloschedtask'
  "critical  /tmp/zeloschedtask is not root's alone" 'chmod 0775 /tmp/zeloschedtask'
  'critical  /tmp/scheduled_tasks is missing' 'rm $STORE'
  'warning   /usr/zelo/etc/scheduled_tasks is missing' 'rm $PERSISTENT'
  'warning   /usr/zelo/etc/scheduled_tasks cannot be read: reading or writing failed' 'truncate -s 100 $PERSISTENT'
  'critical  /tmp/scheduled_tasks cannot be read: reading or writing failed' 'truncate -s 100 $STORE'
  'warning   the working and the persistent copy of the tasks differ' 'echo "# edited" >>$PERSISTENT'
  "warning   /usr/zelo/etc/scheduled_tasks is cut off: 'zelosched restore' writes it anew from /tmp/scheduled_tasks" ': >$PERSISTENT'
  'warning   /etc/crontab lacks the line: 30 8 * * * root /tmp/zeloschedtask --run id=1' 'cp $SCRATCH/crontab /etc/crontab'
  'warning   /etc/crontab has a line that belongs to no task: 1 1 * * * root /tmp/zeloschedtask --run id=7' 'printf "1\t1\t*\t*\t*\troot\t/tmp/zeloschedtask --run id=7\n" >>/etc/crontab'
  'warning   /etc/crontab cannot be read: No such file' 'rm /etc/crontab'
  'critical  /etc/crontab has 10001 lines, and cron ignores all of it when there are more than 10000' 'fill_crontab 10001'
  'warning   task 1 (Task 1): invalid hour 25 (00 to 23)' 'sed -i "s/^run hour=.*/run hour=\"25\"/" $STORE'
  'critical  cron may pass over all of /etc/crontab' 'sed -i "s/^run hour=.*/run hour=\"25\"/" $STORE'
  'warning   task 1 (Task 1): there is no user 77777' 'sed -i "s/^owner=.*/owner=\"77777\"/" $STORE'
  'warning   1 stored task cannot be read' 'sed -i "/^name=/d" $STORE'
  'critical  /tmp/scheduled_tasks can be written by others' 'chmod 0666 $STORE'
  'warning   /usr/zelo/etc/scheduled_tasks.last-good is missing' 'rm $PERSISTENT.last-good'
  'warning   /usr/zelo/etc/scheduled_tasks.last-good is not as /usr/zelo/etc/scheduled_tasks is' 'truncate -s 100 $PERSISTENT.last-good'
)

# Whoever took the advice to save a task would write all copies anew without the others.
nothing_is_changed_before_the_tasks_are_back() {
  all_well
  cp "$PERSISTENT" "$SCRATCH/kept"
  rm "$STORE"
  z list >/dev/null
  local command
  for command in 'add --daily 08:30 -- true' sync status; do
    # shellcheck disable=SC2086
    try z $command
    [[ $status == [14] && $out$err == *"$STORE has no tasks, though some are kept: 'zelosched restore' puts the tasks back"* ]] ||
      { echo "$command: $status $out $err"; return 1; }
  done
  rm "$STORE"
  fails_saying 1 "has no tasks, though some are kept" z add --daily 08:30 -- true &&
    cmp "$PERSISTENT" "$SCRATCH/kept" && cmp "$PERSISTENT.last-good" "$SCRATCH/kept"
}

status_shows_what_was_moved_away() {
  all_well
  mkdir -m 0700 /tmp/zeloscheduler.abcdef
  try z status
  rmdir /tmp/zeloscheduler.abcdef
  [[ $status == 0 && $out == *"moved to /tmp/zeloscheduler.abcdef: look at it and delete it"* ]]
}

a_list_that_fails_says_which_file_it_is() {
  all_well
  chmod 0666 "$STORE"
  fails_saying 1 "$STORE has no tasks, though some are kept: 'zelosched restore' puts the tasks back" z list || return 1
  cp "$PERSISTENT" "$STORE"
  truncate -s -10 "$STORE"
  fails_saying 1 "$STORE cannot be read: 'zelosched restore' puts the tasks back" z list
}

a_fault_can_be_disabled_but_not_enabled() {
  all_well
  sed -i 's/^run hour=.*/run hour="25"/' "$STORE"
  z disable 1 >/dev/null && fails_saying 1 "invalid hour 25 (00 to 23)" z enable 1 &&
    same "$(task_lines)" 0
}

a_bad_task_does_not_hide_the_others() {
  clean
  add --daily 08:30 -- true >/dev/null
  add --daily 08:30 -- true >/dev/null
  sed -i '0,/^start year=/s/^start year=.*/start year="12x"/' "$STORE"
  same "$(ids_of_list)" "[2]"
}

syncs() {
  all_well
  cp "$SCRATCH/crontab" /etc/crontab
  gives 0 "the crontab is in step with the tasks" sync && same "$(task_lines)" 1
}

tells_of_a_crontab_that_cannot_be_written() {
  all_well
  rm /etc/crontab
  fails_saying 1 "the tasks are saved, but cron does not know them all" z add --daily 08:30 -- true &&
    fails_saying 1 "/etc/crontab cannot be read" z sync &&
    same "$(ids_of_list --sort id)" "[1, 2]"
  local result=$?
  cp "$SCRATCH/crontab" /etc/crontab
  return "$result"
}

# ---- failing --------------------------------------------------------------------------------

tells_the_error_in_words() {
  all_well
  truncate -s 100 "$STORE"
  local command bad=0
  for command in list 'show 1' 'add --daily 08:30 -- true' 'edit 1 --daily 09:00' 'remove --yes 1' \
    'run 1' export next; do
    # shellcheck disable=SC2086
    fails_saying 1 "reading or writing failed, or a file is cut off [0x0B00 " z $command || bad=1
  done
  return "$bad"
}

tells_of_a_store_that_cannot_be_written() {
  all_well
  chmod 0666 "$STORE"
  fails_saying 1 "a file is cut off [0x0B00 " z add --daily 08:30 -- true
}

# Not even root can move a directory away on which something is mounted.
hold_database() {
  rm -f /tmp/sched_status.sqlite*
  mkdir /tmp/sched_status.sqlite
  mount -n -t tmpfs none /tmp/sched_status.sqlite
}

let_database_go() {
  umount -n /tmp/sched_status.sqlite
  rmdir /tmp/sched_status.sqlite
}

# with_held_database COMMAND...
with_held_database() {
  local result=0
  hold_database
  "$@" || result=$?
  let_database_go
  return "$result"
}

tells_of_a_database_that_cannot_be_taken() {
  all_well
  with_held_database fails_saying 1 "cannot read /tmp/sched_status.sqlite: it is no regular file" z history
}

tells_of_a_database_that_is_none() {
  all_well
  echo "this is no database, but long enough to be looked at as one" >/tmp/sched_status.sqlite
  chmod 0600 /tmp/sched_status.sqlite
  fails_saying 1 "cannot read /tmp/sched_status.sqlite" z history
}

tasks_are_shown_beside_a_database_that_cannot_be_read() {
  all_well
  with_held_database tasks_are_shown
}

tasks_are_shown() {
  try z list
  [[ $status == 1 && $(tail -1 <<<"$out" | awk '{ print $1, $7 }') == "1 ?" && $err == *"cannot read /tmp/sched_status.sqlite"* ]] || return 1
  add --daily 09:30 -- true >/dev/null
  try z show 1 2
  [[ $status == 1 && $(grep -c 'Last run: ?' <<<"$out") == 2 && $(grep -c 'Command: true' <<<"$out") == 2 &&
    $err == *"cannot read /tmp/sched_status.sqlite"* ]] || { echo "$out$err"; return 1; }
}

kept_runs_are_shown_beside_a_database_that_cannot_be_read() {
  all_well
  z run --wait 1 >/dev/null && z history --keep >/dev/null
  with_held_database try z history
  rm -r /usr/zelo/var
  [[ $status == 1 && $(tail -1 <<<"$out") == *"finished"* && $err == *"cannot read /tmp/sched_status.sqlite"* ]] ||
    { echo "$out$err"; return 1; }
}

moves_a_dangling_link_away() {
  local command
  for command in list 'show 1' history status 'run 1' 'run --wait 1'; do
    all_well
    rm -f /tmp/sched_status.sqlite
    ln -s "$SCRATCH/nothing" /tmp/sched_status.sqlite
    # shellcheck disable=SC2086
    try z $command
    # What reads no task uses the database as it is.
    [[ ! -e $SCRATCH/nothing && ($command == history || ! -L /tmp/sched_status.sqlite) ]] ||
      { echo "$command: $status $out $err"; return 1; }
  done
}

tells_of_a_run_that_cannot_be_recorded() {
  all_well
  with_held_database fails_saying 1 "cannot record a run in /tmp/sched_status.sqlite: a file or the database could not be opened" z run 1
}

every_result_is_told_in_words() {
  all_well
  z run --wait 1 >/dev/null
  local code bad=0
  while IFS='|' read -r code comment words; do
    sqlite3 /tmp/sched_status.sqlite "UPDATE task_status SET status_code=$code, comment='$comment', pid=${pid:-$$}"
    rm -r /usr/zelo/var
    [[ $(z history 1 | tail -1) == *"$words"* ]] || { echo "$code: $(z history 1)"; bad=1; }
  done <<'RESULTS'
0||could not start
3||finished
4||could not start
5|19|killed by signal SIGSTOP (19)
6|9|killed by signal SIGKILL (9)
6|77|killed by signal 77
7|3|failed with exit code 3
9||was running but its process is gone
2||running
RESULTS
  for pid in -1 0 4294967297; do
    sqlite3 /tmp/sched_status.sqlite "UPDATE task_status SET status_code=2, pid=$pid"
    rm -r /usr/zelo/var
    [[ $(z history 1 | tail -1) == *"was running but its process is gone"* ]] || { echo "$pid"; bad=1; }
  done
  return "$bad"
}

options_stand_behind_ids_always() {
  clean
  add --daily 08:30 -- true >/dev/null
  same "$(POSIXLY_CORRECT=1 "$ZELOSCHED" show 1 --json | json 'tasks["id"]')" 1
}

other_users_see_but_do_not_change() {
  all_well
  z run --wait 1 >/dev/null
  copy_for_others
  local nobody=(setpriv --reuid 65534 --regid 65534 --clear-groups "$FOR_OTHERS")
  same "$("${nobody[@]}" list | tail -1 | awk '{ print $1, $7 }')" "1 ?" &&
    fails_saying 1 "changing tasks takes root's rights" "${nobody[@]}" add --daily 08:30 -- true &&
    rm -rf /tmp/sched_status.sqlite* /tmp/lock &&
    fails_saying 1 "running tasks takes root's rights" "${nobody[@]}" run 1 &&
    [[ ! -e /tmp/sched_status.sqlite && ! -e /tmp/lock ]] && z run --wait 1 >/dev/null &&
    fails_saying 1 "that takes root's rights" "${nobody[@]}" history
}

lock_is_no_link() {
  all_well
  rm -f /run/zelosched.lock
  ln -s "$SCRATCH/victim" /run/zelosched.lock
  leaves_all_as_it_was z add --daily 08:30 -- true
  local result=$?
  rm /run/zelosched.lock
  [[ $result == 0 && $err == *"cannot open /run/zelosched.lock: "* && ! -e $SCRATCH/victim ]]
}

# A process that holds the lock on a file until it is ended.
hold_lock() {
  flock --no-fork "$1" sleep 600 &
  held=$!
  until ! flock --nonblock "$1" true; do :; done
}

waiting_for_the_lock_ends() {
  all_well
  hold_lock /run/zelosched.lock
  FAKE_PATIENCE=1 LD_PRELOAD=$FAKE leaves_all_as_it_was z add --daily 08:30 -- true
  local result=$?
  kill "$held"
  [[ $result == 0 && $err == *"waiting for process $held (sleep), which is changing tasks"* &&
    $err == *"process $held (sleep) has been changing tasks for 30 seconds: nothing was changed"* ]]
}

# The library itself waits in silence.
who_holds_the_librarys_lock_is_named() {
  all_well
  hold_lock /run/zeloscheduler.lock
  FAKE_PATIENCE=1 LD_PRELOAD=$FAKE leaves_all_as_it_was z add --daily 08:30 -- true
  local result=$?
  local said=$err
  FAKE_PATIENCE=1 LD_PRELOAD=$FAKE try z status
  kill "$held"
  [[ $result == 0 &&
    $said == *"waiting for process $held (sleep), which holds /run/zeloscheduler.lock"* &&
    $out == *"warning   process $held (sleep) keeps changes of tasks waiting: it holds /run/zeloscheduler.lock"* ]]
}

import_tells_what_it_cannot_read() {
  all_well
  echo '{"a":' >"$SCRATCH/broken"
  local text
  for text in null 5 '"x"' true; do
    echo "$text" >"$SCRATCH/value"
    fails_saying 1 "it is neither an object nor an array" z import "$SCRATCH/value" || return 1
  done
  { z export 1; printf '\0garbage'; } >"$SCRATCH/zero"
  fails_saying 1 "it holds a zero byte" z import "$SCRATCH/zero" &&
    fails_saying 1 "it is no JSON: Line 2, Column 1" z import "$SCRATCH/broken" &&
    fails_saying 1 "cannot open $SCRATCH/none: No such file" z import "$SCRATCH/none" &&
    fails_saying 1 "cannot read $SCRATCH: Is a directory" z import "$SCRATCH" &&
    { head -c 5000 /dev/zero | tr '\0' '['; } >"$SCRATCH/deep" &&
    fails_saying 1 "it is no JSON: " z import "$SCRATCH/deep" &&
    echo '[1]' >"$SCRATCH/number" && fails_saying 1 "it is no JSON object" z import "$SCRATCH/number"
}

# Memory is bounded beside the time: each of these took more than a gigabyte.
an_import_that_is_meant_to_exhaust_the_machine_is_refused() {
  all_well
  local object bad=0 start
  object=$(z export 1 | sed '1d;$d')
  yes '0,' | tr -d '\n' | head -c 15000000 >"$SCRATCH/zeros"
  { printf '['; cat "$SCRATCH/zeros"; printf '0]'; } >"$SCRATCH/wide"
  { printf '/*"*/{"a":[//"\n'; cat "$SCRATCH/zeros"; printf '0]}'; } >"$SCRATCH/hidden"
  { cat "$SCRATCH/zeros"; cat "$SCRATCH/zeros"; } >"$SCRATCH/large"
  times 10001 <<<"$object" | sed 's/"cmd":"true"/"cmd":" "/' >"$SCRATCH/tasks"
  for ((i = 0; i < 10001; i++)); do echo '{}'; done >"$SCRATCH/lines"
  start=$SECONDS
  fails_saying 1 "it holds more values than 10000 tasks have" bounded z import "$SCRATCH/wide" || bad=1
  fails_saying 1 "it holds more values than 10000 tasks have" bounded z import "$SCRATCH/hidden" || bad=1
  fails_saying 1 "$SCRATCH/large is larger than 16 MB: divide it" bounded z import "$SCRATCH/large" || bad=1
  fails_saying 1 "it holds 10001 tasks, and at most 10000 can be read at once" bounded z import "$SCRATCH/tasks" || bad=1
  fails_saying 1 "it holds 10001 tasks, and at most 10000 can be read at once" bounded z import "$SCRATCH/lines" || bad=1
  ((SECONDS - start < 30)) || { echo "took $((SECONDS - start)) s"; bad=1; }
  same "$(ids_of_list)" "[1]" || bad=1
  return "$bad"
}

# In 256 MB of addresses, which no program with sanitizers starts in.
bounded() {
  (
    if ! grep -q __asan_init "$BUILD_DIR/bin/zelosched"; then ulimit -v 262144; fi
    "$@"
  )
}

export_tells_of_bytes_that_json_cannot_carry() {
  clean
  add --daily 08:30 --name $'a\xffb' -- true >/dev/null
  try z export
  same "$status: $err" "0: zelosched: \"name\" of task 1 (a\\xffb) is not UTF-8: bytes that JSON cannot carry were replaced" &&
    same "$(json 'ascii(tasks[0]["name"])' <"$SCRATCH/out")" "'a\\ufffdb'"
}

output_that_fails() {
  all_well
  local command bad=0
  for command in list 'show 1' status next history export 'completion bash' --help --version 'list --help'; do
    local full=0 closed=0
    # shellcheck disable=SC2086
    z $command >/dev/full 2>"$SCRATCH/err" || full=$?
    grep -q 'cannot write the output: No space left on device' "$SCRATCH/err" || full=silent
    # shellcheck disable=SC2086
    z $command >&- 2>"$SCRATCH/err" || closed=$?
    grep -q 'cannot write the output: Bad file descriptor' "$SCRATCH/err" || closed=silent
    same "$full $closed" "1 1" || { echo "$command"; bad=1; }
  done
  return "$bad"
}

closed_streams_harm_nothing() {
  all_well
  z run --wait 1 >&- 2>&- <&- || true
  z add --daily 09:00 -- true >&- 2>&- <&- || true
  same "$(ids_of_list --sort id)" "[1, 2]" && z history >/dev/null
}

ends_quietly_when_the_reader_is_gone() {
  all_well
  same "$(z list | head -c 2)" "ID"
}

same_in_every_locale() {
  clean
  add --daily 08:30 --name $'größe 漢字 \e[31m\xff' -- true >/dev/null
  local locale expected
  expected=$(z list)
  grep -qF 'größe 漢字 \x1b[31m\xff' <<<"$expected" || return 1
  for locale in C C.UTF-8 no_SUCH; do
    same "$(env LC_ALL="$locale" "$ZELOSCHED" list)" "$expected" || return 1
  done
  ! grep -q $'\e' <<<"$expected"
}

# ---- completion -----------------------------------------------------------------------------

# Prints what bash would offer for the line.
completions() {
  PATH=$BUILD_DIR/bin:$PATH bash -c '
    source <(zelosched completion bash)
    COMP_WORDS=("$@")
    COMP_CWORD=$(($# - 1))
    _zelosched
    printf "%s," "${COMPREPLY[@]}"' - "$@"
}

completes() {
  clean
  add --daily 08:30 --name 'Nightly backup' -- true >/dev/null
  add --daily 08:30 --name 'Mirror' -- true >/dev/null
  same "$(completions zelosched he)|$(completions zelosched hi)|$(completions zelosched show '')|$(
    completions zelosched show back)|$(completions zelosched show 2)|$(completions zelosched list --s)|$(
      completions zelosched power '')|$(completions zelosched list --sort o)" \
    ",|history,|1  (Nightly backup),2  (Mirror),|1,|2,|--sort,|list,add,remove,|owner,"
}

completes_file_names() {
  [[ $(PATH=$BUILD_DIR/bin:$PATH bash -c 'source <(zelosched completion bash); complete -p zelosched') == *"-o default"* ]]
}

every_option_is_completed() {
  local name options bad=0
  for name in $(z --help | sed -n 's/^  \([a-z-]*\) .*/\1/p'); do
    options=$(z "$name" --help | grep -oE '^  (-[a-z], )?--[a-z-]+' | grep -oE -- '--[a-z-]+' | sort -u)
    for option in $options; do
      [[ ",$(completions zelosched "$name" "$option")" == *",$option,"* ]] || { echo "$name $option"; bad=1; }
    done
  done
  return "$bad"
}

# ---------------------------------------------------------------------------------------------

have_clock || { skip "everything" "this sandbox cannot hide /sys"; exit 1; }
start_something_like_cron

check "every command has its help" every_command_has_help
check "help fits a terminal" help_fits_the_terminal
check "the version is told" gives 0 "zelosched 4.0.0" --version
check "wrong arguments are usage errors" wrong_arguments_are_usage_errors
check "a blank command is none" fails_saying "$USAGE" "there is no command after '--'" z add --daily 08:30 -- ' '
check "a task is saved as it was told" saves_what_it_was_told
check "several words of a command reach the shell as they are" quotes_words
check "one word of a command is a shell command line" takes_one_word_as_it_is
check "an owner is found by name and by number" finds_owners
check "an edit changes what is named and nothing else" edits_only_what_is_named
check "what the application forbids takes --force" respects_the_application
check "an unknown id does not keep the others from being done" does_the_others
check "what would do harm is refused and changes nothing" refuses
check "an import with one bad task changes nothing" refuses_import_as_a_whole
check "nor does one with a power time that has no room" imports_power_times_whole_or_not_at_all
check "an import goes on when its reader is gone" imports_to_the_end_when_the_reader_is_gone
check "an import of a task without its day is refused" an_import_without_its_day_is_refused
check "an import without tasks is told" an_empty_import_is_told
check "an import that is meant to exhaust the machine is refused" \
  an_import_that_is_meant_to_exhaust_the_machine_is_refused
check "a minute that never comes is told" a_minute_that_never_comes_is_told
check "nothing but what was shown is removed" nothing_but_what_was_shown_is_removed
check "and a power time that was shown, whatever its place" a_power_time_that_was_shown_is_removed
check "power times that are removed at once are all removed" eight_power_times_are_removed_at_once
check "of several tasks the missing ones are told" next_of_several_tells_what_is_missing
check "the coming runs of many tasks are quick" next_of_many_is_quick
check "those of an hourly task beside yearly ones too" next_beside_rare_tasks_is_quick
check "both forms of an export are imported unchanged" imports_what_it_exports
check "an import takes one object, or one a line" imports_one_object_or_lines
check "the doubly encoded form is the library's" agrees_with_the_library_on_the_wire_form
check "twenty commands at once all take effect" twenty_at_once
check "tasks are listed by their next run" lists_by_next_run
check "only wanted tasks are listed" lists_chosen_tasks
check "tasks are sorted by each key" sorts
check "a task is shown" shows_a_task
check "the coming runs are shown day by day" shows_the_coming_runs
check "ids of all lengths are aligned" aligns_ids
check "a year of five digits comes last" sorts_a_far_year_last
check "a task may start with a year" shows_a_start_from_the_beginning_of_a_year
check "looking makes the status database root's alone" looking_makes_it_roots_alone
check "a run's result is told" runs_and_tells_the_result
check "a wait is for its own run alone" waits_for_its_own_run_only
check "without --wait the run goes on by itself" lets_the_run_go_on
check "what a run prints is shown when wanted" shows_the_output_when_told_to
check "what a run prints goes into a file as it is" passes_output_on_unchanged
check "a daemon that a run leaves behind is not waited for" output_does_not_wait_for_a_daemon
check "of a long output no more is held than was read at once" streams_output
check "a run goes on when nobody reads its output any more" goes_on_when_the_reader_is_gone
check "a run is not held up by output that cannot be written" tells_of_output_that_cannot_be_written
check "a run leaves the input to its caller" leaves_input_to_its_caller
if chown 65534 "$SCRATCH" 2>/dev/null && chown "$EUID" "$SCRATCH"; then
  check "an owner may open the output by name, for writing alone" an_owner_may_name_the_output
else
  skip "an owner may open the output by name, for writing alone" "needs other users"
fi
check "a run that gave up is told" tells_that_a_run_gave_up
check "what is in the way of its turn is moved away" has_its_turn_whatever_is_in_the_way
check "a run that died is told" tells_that_a_run_died
check "the history has every run" keeps_history
check "a run that goes on has its duration" shows_how_long_a_run_goes_on
check "power times are added, changed and removed" looks_after_power_times
check "power remove takes power times only" power_remove_refuses_other_tasks
check "no more power times are added than are shown" power_lists_are_bounded
check "power times are exported and imported" exports_power_times
check "a clock that cannot be armed is told" tells_of_a_clock_that_fails
check "status is well when all is" status_is_well
check "status shows what was moved away" status_shows_what_was_moved_away
check "nothing is changed before the tasks are back" nothing_is_changed_before_the_tasks_are_back
check "a list that fails says which file it is" a_list_that_fails_says_which_file_it_is
for ((i = 0; i < ${#DAMAGES[@]}; i += 2)); do
  check "status finds: ${DAMAGES[i]} ($((i / 2 + 1)))" status_finds "${DAMAGES[i]}" "${DAMAGES[i + 1]}"
done
check "a task with a fault can be disabled but not enabled" a_fault_can_be_disabled_but_not_enabled
check "a task that cannot be read does not hide the others" a_bad_task_does_not_hide_the_others
check "sync writes the crontab again" syncs
check "but no line that cron cannot read" writes_no_line_that_cron_cannot_read
check "nor does any change, which is refused" no_change_writes_a_line_that_cron_cannot_read
check "but that of the task itself" a_task_that_cron_cannot_read_can_be_changed
check "no change makes the crontab too long for cron" no_change_makes_the_crontab_too_long
check "nor does an import, all of it together" an_import_that_would_make_the_crontab_too_long_saves_nothing
check "beside a full crontab what adds no line is saved" what_adds_no_line_is_saved_beside_a_full_crontab
check "beside such a task the clock is armed" arms_the_clock_beside_a_task_that_cron_cannot_read
check "and when the tasks cannot be read" arms_the_clock_beside_tasks_that_are_not_there
check "a damaged power list keeps no task out of the crontab" writes_the_tasks_beside_a_damaged_power_list
check "a clock that is not armed is told" tells_of_a_clock_that_is_not_armed
check "a crontab that cannot be written is told" tells_of_a_crontab_that_cannot_be_written
check "the error record is told in words" tells_the_error_in_words
check "a store that is not root's alone is refused" tells_of_a_store_that_cannot_be_written
check "a status database that cannot be taken is refused" tells_of_a_database_that_cannot_be_taken
check "a status database that is none is told" tells_of_a_database_that_is_none
check "and tasks are shown beside it" tasks_are_shown_beside_a_database_that_cannot_be_read
check "and so are the runs that were kept" kept_runs_are_shown_beside_a_database_that_cannot_be_read
check "a link to nowhere is moved away and not followed" moves_a_dangling_link_away
check "a run that cannot be recorded is told" tells_of_a_run_that_cannot_be_recorded
check "every result is told in words" every_result_is_told_in_words
check "options stand behind ids always" options_stand_behind_ids_always
if grep -qE '^ *0 +0 +[0-9]{2,}' /proc/self/uid_map; then
  check "other users see tasks but do not change them" other_users_see_but_do_not_change
else
  skip "other users see tasks but do not change them" "this sandbox has no user but 0"
fi
check "the lock file is no link" lock_is_no_link
check "waiting for the lock ends" waiting_for_the_lock_ends
check "who holds the library's lock is named" who_holds_the_librarys_lock_is_named
check "an import that cannot be read is told" import_tells_what_it_cannot_read
check "an export tells of bytes that JSON cannot carry" export_tells_of_bytes_that_json_cannot_carry
check "output that cannot be written is a failure" output_that_fails
check "closed streams harm nothing" closed_streams_harm_nothing
check "a reader that is gone ends the output quietly" ends_quietly_when_the_reader_is_gone
check "a pipe gets the same in every locale" same_in_every_locale
check "commands, options and tasks are completed" completes
check "and file names, where nothing else fits" completes_file_names
check "every option of every command is completed" every_option_is_completed
finish
