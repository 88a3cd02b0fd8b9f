#!/bin/bash
# The JSON that zelosched writes and reads: each output against the schema in docs/schema, round trips
# of files, and the messages for those that cannot be read.
#
# Functions are called by check, and what stands in single quotes is for another shell:
# shellcheck disable=SC2317,SC2016
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"
# shellcheck source=tests/support/zelosched_test.sh
. "$here/support/zelosched_test.sh"

readonly PYTHON=/usr/bin/python3 # which has Debian's jsonschema
export TZ=Europe/Berlin

# ---- helpers --------------------------------------------------------------------------------

is_valid() {
  "$PYTHON" "$here/support/json_schema.py" "$@"
}

# of EXPRESSION: prints it for the JSON on standard input
of() {
  "$PYTHON" -c "import json, sys; top = json.load(sys.stdin); print($1)"
}

# says STATUS ERRORS...: checks the status, and each line of standard error
says() {
  local wanted=$1
  shift
  same "$status: $err" "$wanted: $(printf '%s\n' "$@")"
}

# Of every kind: types, states, texts, runs that ended in all ways, and what other programs save.
all_kinds() {
  clean
  add --once 2099-12-24T18:30 --name once -- true
  add --daily 02:30 --name 'größe "漢字" \ 😀' --app backup --app-name Backup --app-args 'a b' \
    --action copies --owner nobody --time-limit 2h -- "echo 'a'; exit 7"
  add --weekly mon,wed-fri 08:00 --every 2h --until 18 --start 2098-01-01 --name weekly -- 'kill -9 $$'
  add --monthly 31 08:00 --start 2027-01-31 --name monthly --overlap yes --app-overlap no -- true
  add --yearly 02-29 08:00 --name yearly --disabled -- true
  z power add on --weekly mon-fri 07:30 >/dev/null
  z power add off --daily 23:00 --disabled >/dev/null
  z run 1 --wait >/dev/null
  z run 2 3 --wait >/dev/null 2>&1 || true
}

# A task that another program has saved, with an hour, a month and days that do not exist.
spoil() {
  local change
  for change in "$@"; do
    sed -i "s/^\\(${change%%=*}\\)=.*/\\1=\"${change#*=}\"/" "$STORE" "$PERSISTENT"
  done
}

# ---- outputs --------------------------------------------------------------------------------

list_is_valid() {
  all_kinds
  z list --all --json | is_valid tasks && z list --all --power --json | is_valid tasks &&
    z list --failed --json | is_valid tasks && z list --running --json | is_valid tasks &&
    same "$(z list --all --power --json | of 'len(top["tasks"]), len(top["power_times"])')" "5 2"
}

show_is_valid() {
  local ids
  all_kinds
  ids=$(z list --all --power --json | of '*(t["id"] for t in top["tasks"] + top["power_times"])')
  # shellcheck disable=SC2086
  z show --json $ids | is_valid tasks && z show --json 1 | is_valid tasks &&
    same "$(z show --json 2 | of '[top["tasks"][0]["last_run"][k] for k in ("outcome", "exit_code", "task_name")]')" \
      "['failed', 7, 'größe \"漢字\" \\\\ 😀']" &&
    same "$(z show --json 3 | of '[top["tasks"][0]["last_run"][k] for k in ("outcome", "signal", "exit_code")]')" \
      "['killed', 9, None]"
}

a_run_that_goes_on_is_valid() {
  clean
  add --daily 08:30 --name long -- 'sleep 60'
  z run 1 >/dev/null
  until [[ $(z list --running --json | of 'len(top["tasks"])') == 1 ]]; do sleep 0.01; done
  z show 1 --json | is_valid tasks &&
    same "$(z show 1 --json | of '[(t["running"], t["last_run"]["state"], t["last_run"]["outcome"]) for t in top["tasks"]]')" \
      "[(True, 'running', None)]"
}

next_is_valid() {
  all_kinds
  z next --json | is_valid coming_runs && z next --json --count 200 | is_valid coming_runs &&
    same "$(at '2026-11-22 12:00' next --json --count 1 1 | of 'top["runs"][0]["due"]')" "2099-12-24T18:30:00+01:00"
}

preview_is_valid() {
  clean
  echo '{"version": 1, "tasks": [{"name": "n", "owner": "root", "command": "true", "schedule": {"type": "daily", "at": "08:30"}}]}' |
    z next --preview --json | is_valid preview || return 1
  { echo '{"version": 1, "tasks": [{}, {}], "x": 1}' | z next --preview --json || true; } | is_valid preview
}

mail_is_valid() {
  z mail --json | is_valid mail
}

owners_is_valid() {
  z owners --json | is_valid owners
}

power_list_is_valid() {
  all_kinds
  z power list --json | is_valid power_times &&
    same "$(z power list --json | of '[(t["power"], t["enabled"], t["at"], t["days"][:2]) for t in top["power_times"]]')" \
      "[('on', True, '07:30', ['mon', 'tue']), ('off', False, '23:00', ['mon', 'tue'])]"
}

export_is_valid() {
  all_kinds
  z export | is_valid file && z export 2 once | is_valid file &&
    same "$(z export | of '[k for t in top["tasks"] for k in ("id", "owner_uid", "next_run", "last_run", "problems") if k in t]')" "[]"
}

status_is_valid() {
  all_kinds
  { z status --json || true; } | is_valid status
}

history_is_valid() {
  clean
  add --daily 08:30 --name fails --owner nobody -- 'echo "größe"; exit 3'
  add --daily 08:30 --name bytes -- 'printf "a\377b"'
  add --daily 08:30 --name long -- 'i=0; while [ $i -lt 20000 ]; do echo "größer $i"; i=$((i + 1)); done'
  z run fails bytes long --wait >/dev/null 2>&1 || true
  z history --json | is_valid runs && z history --json --failed | is_valid runs &&
    same "$(z history --json | of '[(r["task_name"], r["outcome"], r["exit_code"]) for r in top["runs"]][::-1]')" \
      "[('fails', 'failed', 3), ('bytes', 'finished', 0), ('long', 'finished', 0)]"
}

log_is_valid() {
  local name
  for name in fails bytes long; do z log "$name" --json | is_valid log || return 1; done
  same "$(z log fails --json | of '[top["output"][k] for k in ("head", "tail", "left_out_bytes", "encoding")], top["run"]["outcome"]')" \
    "['größe\n', None, 0, 'utf-8'] failed" &&
    same "$(z log bytes --json | of 'top["output"]["head"], top["output"]["encoding"]')" "Yf9i base64" &&
    same "$(z log long --json | of 'top["output"]["encoding"], top["output"]["left_out_bytes"] > 100000,
      len((top["output"]["head"] + top["output"]["tail"]).encode()) + top["output"]["left_out_bytes"] == top["run"]["output_bytes"]')" \
      "utf-8 True True"
}

nothing_is_valid() {
  clean
  z list --json | is_valid tasks && z list --power --json | is_valid tasks && z next --json | is_valid coming_runs &&
    z history --json | is_valid runs &&
    z power list --json | is_valid power_times && z export | is_valid file
}

what_others_saved_is_valid() {
  local bad=0 fault
  for fault in 'run hour=99' 'run min=4000000000' 'start month=13' 'owner=4000000000' 'repeat hour=4294967295' \
    'last work hour=4294967295' 'start year=10000' 'start day=0' 'week=0000000' 'week=1' 'listable=5' 'name='; do
    all_kinds
    spoil "$fault"
    z list --all --power --json | is_valid tasks || { echo "$fault: list"; bad=1; }
    z next --json | is_valid coming_runs || { echo "$fault: next"; bad=1; }
  done
  return "$bad"
}

tells_problems() {
  clean
  add --daily 08:30 --name bad -- true
  spoil 'run hour=25'
  same "$(z show 1 --json | of 'top["tasks"][0]["schedule"]["at"], top["tasks"][0]["problems"]')" \
    "25:30 ['invalid hour 25 (00 to 23)']"
}

what_cannot_be_seen_is_absent() {
  all_kinds
  copy_for_others
  setpriv --reuid=65534 --regid=65534 --clear-groups "$FOR_OTHERS" list --json >"$SCRATCH/out"
  is_valid tasks <"$SCRATCH/out" &&
    same "$(of '[k for t in top["tasks"] for k in t if k in ("last_run", "running")]' <"$SCRATCH/out")" "[]"
}

# A test that cannot fail would show nothing.
the_schema_refuses() {
  local edit bad=0
  all_kinds
  z list --all --json >"$SCRATCH/good"
  for edit in 'top["version"] = 2' 'top["more"] = 1' 'del top["tasks"][0]["id"]' 'top["tasks"][0]["more"] = 1' \
    'top["tasks"][0]["app"] = ""' 'top["tasks"][0]["app"] = "N/A"' 'top["tasks"][0]["owner"] = None' \
    'top["tasks"][0]["next_run"] = "2026-11-22 08:30"' 'top["tasks"][0]["enabled"] = 1' \
    'top["tasks"][0]["schedule"]["days"] = []' 'top["tasks"][0]["last_run"] = {}' \
    'top["tasks"][0]["overlap"]["x"] = True' 'top["tasks"][0]["time_limit"] = "2w"'; do
    "$PYTHON" -c "import json, sys
top = json.load(sys.stdin)
$edit
print(json.dumps(top))" <"$SCRATCH/good" >"$SCRATCH/bad"
    ! is_valid tasks <"$SCRATCH/bad" >/dev/null || { echo "valid: $edit"; bad=1; }
  done
  return "$bad"
}

# ---- files ----------------------------------------------------------------------------------

comes_back_as_it_was() {
  all_kinds
  z export >"$SCRATCH/before"
  z export --wire | "$PYTHON" -c 'import json, sys
for line in sys.stdin: print({k: v for k, v in json.loads(line).items() if k not in ("id", "next trigger time")})' |
    grep -v PowerO | sort >"$SCRATCH/wire"
  clean
  z import "$SCRATCH/before" >/dev/null && z export | diff "$SCRATCH/before" - || return 1
  z export --wire | "$PYTHON" -c 'import json, sys
for line in sys.stdin: print({k: v for k, v in json.loads(line).items() if k not in ("id", "next trigger time")})' |
    sort | diff "$SCRATCH/wire" -
}

applied_where_it_is_from_it_changes_nothing() {
  z export 2 3 4 5 >"$SCRATCH/file"
  z apply "$SCRATCH/file" >"$SCRATCH/out"
  same "$(grep -c ' unchanged$' "$SCRATCH/out") of $(wc -l <"$SCRATCH/out")" "4 of 4"
}

an_export_changes_nothing_where_it_is_from() {
  local field
  all_kinds
  applied_where_it_is_from_it_changes_nothing || return 1
  # Fields of no effect on the daily task, which another program may have stored.
  for field in 'start year=2000' 'start month=0' 'start day=0' 'last work hour=5' 'week=1000000' 'listable=0' \
    'can edit from ui=0'; do
    sed -i "/^\[2\]/,/^\[3\]/s/^${field%%=*}=.*/${field%%=*}=\"${field#*=}\"/" "$STORE"
    grep -q "^${field%%=*}=\"${field#*=}\"" "$STORE" || return 1
  done
  sed -i '/^# end of file/d; /^# zelo section file/d' "$STORE"
  applied_where_it_is_from_it_changes_nothing
}

comes_back_from_what_lists_tell() {
  all_kinds
  z list --all --json >"$SCRATCH/told"
  z export >"$SCRATCH/before"
  clean
  z import - <"$SCRATCH/told" >/dev/null && z export | diff "$SCRATCH/before" -
}

# Ordered by key, and independent of ids, of the time, and of runs.
an_export_changes_with_the_tasks_alone() {
  clean
  add --daily 08:30 --name b -- true
  add --daily 08:30 --name a --app z -- true
  add --daily 08:30 --name a -- true
  at '2026-11-22 12:00' export >"$SCRATCH/first"
  z run 2 --wait >/dev/null
  z remove --yes 1 >/dev/null
  add --daily 08:30 --name c --disabled -- true
  z remove --yes c >/dev/null
  add --daily 08:30 --name b -- true
  at '2027-07-01 12:00' export | diff "$SCRATCH/first" - &&
    same "$(of '[(t["app"], t["name"]) for t in top["tasks"]]' <"$SCRATCH/first")" "[(None, 'a'), (None, 'b'), ('z', 'a')]"
}

defaults_are_those_of_add() {
  clean
  add --daily 08:30 --name one -- true
  z export --wire >"$SCRATCH/added"
  clean
  echo '{"version": 1, "tasks": [{"name": "one", "owner": "root", "schedule": {"type": "daily", "at": "08:30"}, "command": "true"}]}' |
    z import - >/dev/null
  z export --wire | diff "$SCRATCH/added" -
}

what_is_not_utf8_is_left_out() {
  clean
  add --daily 08:30 --name $'a\xffb' -- true
  add --daily 08:30 --name good -- true
  add --daily 08:30 --name command -- $'echo \xff'
  add --daily 08:30 --name arguments --app-args $'\xff' -- true
  try z export
  says 1 "zelosched: task 1 (a\\xffb) was left out: its name is not UTF-8, which JSON cannot carry: see --wire" \
    "zelosched: task 3 (command) was left out: its command is not UTF-8, which JSON cannot carry: see --wire" \
    "zelosched: task 4 (arguments) was left out: its app_args is not UTF-8, which JSON cannot carry: see --wire" &&
    same "$(of '[t["name"] for t in top["tasks"]]' <"$SCRATCH/out")" "['good']" && z list --json | is_valid tasks
}

power_times_are_not_exported() {
  clean
  z power add on --daily 07:30 >/dev/null
  z power add off --daily 23:00 >/dev/null
  try z export
  says 0 "" && same "$(of 'top["tasks"]' <"$SCRATCH/out")" "[]" || return 1
  try z export 71270730
  says 1 "zelosched: task 71270730 (Poweron 0) is a power time, which no export holds"
}

imports_of_lists_can_be_pretty() {
  clean
  printf '{\n "version": 1.0,\n "tasks": [ { "schedule": {"at":"08:30","type":"weekly","days":["sun"]},\n "command":"\\u00e4", "name":"n","owner":0, "app":"", "id": 99 } ] }' |
    z import - >/dev/null
  same "$(z export | of '[(t["command"], t["app"], t["owner"], t["schedule"]["days"]) for t in top["tasks"]]')" \
    "[('ä', None, 'root', ['sun'])]"
}

# Each fault with its place, and nothing changed.
tells_every_fault() {
  local bad=0 member wanted before
  all_kinds
  before=$(state)
  while IFS='|' read -r member wanted; do
    [[ -n $member ]] || continue
    "$PYTHON" - "$member" >"$SCRATCH/file" <<'PY'
import json, sys
task = {"name": "n", "owner": "root", "schedule": {"type": "daily", "at": "08:30"}, "command": "true"}
top = {"version": 1, "tasks": [dict(task, name="other", schedule=dict(task["schedule"])), task]}
exec(sys.argv[1])
print(json.dumps(top))
PY
    try z import "$SCRATCH/file"
    says 1 "zelosched: $wanted" "zelosched: nothing was imported, because of 1 fault" || { echo "$member"; bad=1; }
    same "$out" "" || bad=1
    same "$(state)" "$before" || { echo "changed by $member"; bad=1; }
  done <<'FAULTS'
del top["version"]|version: is missing
top["version"] = 2|version: is 2, and this zelosched reads 1
top["version"] = "1"|version: is '1', and this zelosched reads 1
del top["tasks"]|tasks: is missing
top["tasks"] = {}|tasks: must be a list, not {}
top["runs"] = []|runs: there is no such member
top["tasks"][1] = 7|tasks[1]: must be an object, not 7
task["nmae"] = 1|tasks[1].nmae: there is no such member
del task["name"]|tasks[1].name: is missing
task["name"] = ""|tasks[1].name: is empty: give the task a name
task["name"] = None|tasks[1].name: is empty: give the task a name
task["name"] = 5|tasks[1].name: must be a text, not 5
task["name"] = "a\nb"|tasks[1].name: has a line feed: write it on one line
task["name"] = "a\0b"|tasks[1].name: holds a zero byte
task["name"] = "\udc00"|tasks[1].name: holds half a character
task["name"] = "x" * 4096|tasks[1].name: is 4096 bytes long: shorten it to 4095
task["app"] = "x" * 1024|tasks[1].app: is 1024 bytes long: shorten it to 1023
task["app"] = "ZELO.TOV.TaskScheduler.AutoPower"|tasks[1].app: is that of the power times, which 'zelosched power add' adds
task["app"] = "Bob's"|tasks[1]: the application 'Bob's' has an apostrophe, with which no run could be recorded: write it without
task["app_args"] = []|tasks[1].app_args: must be a text, not []
task["action"] = True|tasks[1].action: must be a text, not true
del task["owner"]|tasks[1].owner: is missing
task["owner"] = "no such"|tasks[1].owner: there is no user 'no such', the owner of 'n': write the name of one that 'getent passwd' lists
task["owner"] = 4000000000|tasks[1].owner: there is no user 4000000000, the owner of 'n': write the name of one that 'getent passwd' lists
task["owner"] = 4294967296|tasks[1].owner: there is no user 4294967296, the owner of 'n': write the name of one that 'getent passwd' lists
task["owner"] = -1|tasks[1].owner: there is no user -1, the owner of 'n': write the name of one that 'getent passwd' lists
task["enabled"] = "yes"|tasks[1].enabled: must be true or false, not 'yes'
del task["command"]|tasks[1].command: is missing
task["command"] = " \n"|tasks[1].command: there is no command
task["command"] = "x" * 12288|tasks[1].command: is 12288 bytes long, and only 12287 can be stored: put it into a script
task["command"] = "x" * 12280; task["time_limit"] = "2h"|tasks[1].command: is with its time limit 12316 bytes long, and only 12287 can be stored: put it into a script
task["command"] = "timeout --kill-after=30s 2h sh -c 'x'"|tasks[1].command: has a time limit of its own: write it as "time_limit"
task["time_limit"] = "2"|tasks[1].time_limit: '2' is no time limit: write it as "90s", "30m", "2h" or "1d"
task["time_limit"] = 2|tasks[1].time_limit: 2 is no time limit: write it as "90s", "30m", "2h" or "1d"
task["overlap"] = True|tasks[1].overlap: must be an object, not true
task["overlap"] = {"task": 1}|tasks[1].overlap.task: must be true or false, not 1
task["overlap"] = {"tasks": True}|tasks[1].overlap.tasks: there is no such member
task["ui"] = {"edit_form": 1}|tasks[1].ui.edit_form: must be a text, not 1
task["ui"] = {"listable": None}|tasks[1].ui.listable: must be true or false, not null
del task["schedule"]|tasks[1].schedule: is missing
task["schedule"] = "daily"|tasks[1].schedule: must be an object, not 'daily'
del task["schedule"]["type"]|tasks[1].schedule.type: is missing
task["schedule"]["type"] = "hourly"|tasks[1].schedule.type: must be once, daily, weekly, monthly or yearly, not 'hourly'
del task["schedule"]["at"]|tasks[1].schedule.at: is missing
task["schedule"]["at"] = "24:00"|tasks[1].schedule.at: '24:00' is no time of day: write it as "08:30"
task["schedule"]["at"] = "8:30"|tasks[1].schedule.at: '8:30' is no time of day: write it as "08:30"
task["schedule"]["at"] = "08:300"|tasks[1].schedule.at: '08:300' is no time of day: write it as "08:30"
task["schedule"]["at"] = 8|tasks[1].schedule.at: 8 is no time of day: write it as "08:30"
task["schedule"]["days"] = ["mon"]|tasks[1].schedule.days: is not for a schedule of type daily
task["schedule"]["on"] = 1|tasks[1].schedule.on: there is no such member
task["schedule"]["every_hours"] = 4294967296|tasks[1].schedule.every_hours: must be a number from 1 to 4294967295, not 4294967296
task["schedule"]["every_hours"] = 0|tasks[1].schedule.every_hours: must be a number from 1 to 4294967295, not 0
task["schedule"]["every_hours"] = 1.5|tasks[1].schedule.every_hours: must be a number from 1 to 4294967295, not 1.5
task["schedule"]["until_hour"] = 18|tasks[1].schedule.until_hour: is for a task that repeats: add every_hours
task["schedule"].update(every_hours=2, until_hour=24)|tasks[1].schedule.until_hour: must be a number from 0 to 23, not 24
task["schedule"].update(every_hours=2, until_hour=7)|tasks[1].schedule.until_hour: is before the hour of "at"
task["schedule"]["from"] = "2026-02-29"|tasks[1].schedule.from: '2026-02-29' does not exist: write a day that its month has
task["schedule"]["from"] = "soon"|tasks[1].schedule.from: 'soon' is no date: write it as "2026-12-24"
task["schedule"] = {"type": "once", "at": "08:30"}|tasks[1].schedule.date: is missing
task["schedule"] = {"type": "once", "at": "08:30", "date": "2099-02-29"}|tasks[1].schedule.date: '2099-02-29' does not exist: write a day that its month has
task["schedule"] = {"type": "once", "at": "08:30", "date": "2099-02-28", "from": "2099-02-28"}|tasks[1].schedule.from: is not for a task that runs once
task["schedule"] = {"type": "weekly", "at": "08:30"}|tasks[1].schedule.days: is missing
task["schedule"] = {"type": "weekly", "at": "08:30", "days": []}|tasks[1].schedule.days: must be a list of days, such as ["mon", "fri"], not []
task["schedule"] = {"type": "weekly", "at": "08:30", "days": ["mon", "Fri"]}|tasks[1].schedule.days[1]: 'Fri' is no day: write mon, tue, wed, thu, fri, sat or sun
task["schedule"] = {"type": "weekly", "at": "08:30", "days": ["mon", "mon"]}|tasks[1].schedule.days[1]: 'mon' stands there twice
task["schedule"] = {"type": "monthly", "at": "08:30"}|tasks[1].schedule.day: is missing
task["schedule"] = {"type": "monthly", "at": "08:30", "day": 32}|tasks[1].schedule.day: must be a number from 1 to 31, not 32
task["schedule"] = {"type": "monthly", "at": "08:30", "day": 15, "from": "2027-01-14"}|tasks[1].schedule.from: must be a day on which the task runs, which '2027-01-14' is not
task["schedule"] = {"type": "yearly", "at": "08:30", "day": 1}|tasks[1].schedule.month: is missing
task["schedule"] = {"type": "yearly", "at": "08:30", "day": 31, "month": 4}|tasks[1].schedule.day: month 4 never has a day 31
FAULTS
  return "$bad"
}

all_faults_are_told_at_once() {
  clean
  cat >"$SCRATCH/file" <<'JSON'
{"version": 1, "more": 0, "tasks": [
  {"name": "a", "owner": "nobody", "schedule": {"type": "weekly", "at": "25:00", "days": ["x"]}, "command": ""},
  {"name": "good", "owner": "nobody", "schedule": {"type": "daily", "at": "08:00"}, "command": "true"},
  {"owner": "nix", "time_limit": "2x"}]}
JSON
  try z import "$SCRATCH/file"
  says 1 "zelosched: more: there is no such member" "zelosched: tasks[0].command: there is no command" \
    "zelosched: tasks[0].schedule.at: '25:00' is no time of day: write it as \"08:30\"" \
    "zelosched: tasks[0].schedule.days[0]: 'x' is no day: write mon, tue, wed, thu, fri, sat or sun" \
    "zelosched: tasks[2].name: is missing" \
    "zelosched: tasks[2].owner: there is no user 'nix': write the name of one that 'getent passwd' lists" \
    "zelosched: tasks[2].time_limit: '2x' is no time limit: write it as \"90s\", \"30m\", \"2h\" or \"1d\"" \
    "zelosched: tasks[2].command: is missing" "zelosched: tasks[2].schedule: is missing" \
    "zelosched: nothing was imported, because of 9 faults" && same "$(z export | of 'top["tasks"]')" "[]"
}

is_no_json() {
  local bad=0 text wanted
  clean
  while IFS='|' read -r text wanted; do
    printf '%b' "$text" >"$SCRATCH/file"
    try z import "$SCRATCH/file"
    [[ $status == 1 && $err == "zelosched: $wanted"* && -z $out ]] || { echo "$text: $status $err"; bad=1; }
  done <<'TEXTS'
|it is no JSON: 
7|it is no JSON: 
{"version": 1, "tasks": [}|it is no JSON: Line 1, Column 26
{"version": 1, "version": 1, "tasks": []}|it is no JSON: Line 1, Column 16: Duplicate key
{"version": 1, "tasks": []} x|it is no JSON: 
{"version": 1, "tasks": []}\0|it holds a zero byte
{"version": 1, "tasks": ["\xff"]}|it is not UTF-8
[]|it must be an object, not []
TEXTS
  head -c 5000 /dev/zero | tr '\0' '[' >"$SCRATCH/file"
  try z import "$SCRATCH/file"
  [[ $status == 1 && $err == "zelosched: it is no JSON: "* ]] || { echo "deep: $err"; bad=1; }
  return "$bad"
}

a_file_that_is_too_large_is_refused() {
  clean
  "$PYTHON" -c 'print("{\"version\": 1, \"tasks\": [" + ",".join(["{}"] * 10001) + "]}")' >"$SCRATCH/file"
  try z import "$SCRATCH/file"
  says 1 "zelosched: tasks: are 10001, and at most 10000 can be read at once: divide them" \
    "zelosched: nothing was imported, because of 1 fault"
}

new_is_for_wire() {
  try z import --new "$SCRATCH/file"
  [[ $status == 2 && $err == *"'--new' is for --wire"* ]]
}

an_import_that_does_not_fit_saves_nothing() {
  clean
  add --daily 08:30 --name one -- true
  add --daily 08:30 --name two -- true
  z export >"$SCRATCH/file"
  z remove --yes one two >/dev/null
  local before present
  present=$(wc -l </etc/crontab)
  yes '#' | head -n "$((9799 - present))" >>/etc/crontab
  before=$(state)
  try z import "$SCRATCH/file"
  [[ $status == 1 && $err == *"more than 9800 lines"* ]] && same "$(state)" "$before"
}

times_have_the_distance_of_their_day() {
  clean
  add --daily 08:30 --name one -- true
  same "$(at '2026-03-28 12:00' next --json --count 2 | of '[r["due"] for r in top["runs"]]')" \
    "['2026-03-29T08:30:00+02:00', '2026-03-30T08:30:00+02:00']" &&
    same "$(TZ=America/St_Johns at '2026-03-01 12:00' next --json --count 1 | of 'top["runs"][0]["due"]')" \
      "2026-03-02T08:30:00-03:30"
}

start_zelosched_tests
check "what 'list' tells is what the schema says" list_is_valid
check "what 'show' tells, too" show_is_valid
check "and of a run that goes on" a_run_that_goes_on_is_valid
check "what 'next' tells, too" next_is_valid
check "what it tells of a task that is not saved" preview_is_valid
check "what 'owners' tells" owners_is_valid
check "what 'mail' tells" mail_is_valid
check "what 'power list' tells, too" power_list_is_valid
check "what 'export' writes, too" export_is_valid
check "what 'status' tells, too" status_is_valid
check "what 'history' tells, too" history_is_valid
check "what 'log' tells, whatever was printed" log_is_valid
check "and where there is nothing to tell" nothing_is_valid
check "tasks that other programs have saved are told by it" what_others_saved_is_valid
check "what is wrong with a task is told" tells_problems
if ((EUID == 0)) && [[ $(wc -l </proc/self/uid_map) == 1 && $(awk '{ print $3 }' /proc/self/uid_map) != 1 ]]; then
  check "what the caller may not see is absent" what_cannot_be_seen_is_absent
else
  skip "what the caller may not see is absent" "this sandbox has no user but 0"
fi
check "the schema refuses what is none of it" the_schema_refuses
check "an export is imported as it was" comes_back_as_it_was
check "an export changes nothing where it is from" an_export_changes_nothing_where_it_is_from
check "what 'list' tells can be imported" comes_back_from_what_lists_tell
check "an export changes with the tasks alone" an_export_changes_with_the_tasks_alone
check "what a file leaves out is as 'add' leaves it" defaults_are_those_of_add
check "a text that is not UTF-8 is named, its task is left out" what_is_not_utf8_is_left_out
check "power times are not exported" power_times_are_not_exported
check "a file may be written as JSON allows" imports_of_lists_can_be_pretty
check "each fault of a file is told with its place, and nothing is changed" tells_every_fault
check "all faults are told at once" all_faults_are_told_at_once
check "what is no JSON is told" is_no_json
check "too many tasks are refused" a_file_that_is_too_large_is_refused
check "--new stands with --wire alone" new_is_for_wire
check "an import whose lines do not fit saves nothing" an_import_that_does_not_fit_saves_nothing
check "times are told with the distance from UTC of their day" times_have_the_distance_of_their_day
finish
