#!/bin/bash
# 'zelosched apply', which keeps the tasks of many machines the same: its output, that it takes turns
# with others, and the state after it fails or is killed at any step.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"
# shellcheck source=tests/support/zelosched_test.sh
. "$here/support/zelosched_test.sh"

readonly PYTHON=/usr/bin/python3 # which has Debian's jsonschema
readonly FAIL=$BUILD_DIR/tests/fail_step.so

# A build for sanitizers or coverage makes many more calls.
if grep -q -e __asan_init -e __gcov_ "$ZELOSCHED"; then
  readonly IS_WATCHED=true STRIDE=20
else
  readonly IS_WATCHED=false STRIDE=1
fi

# ---- helpers --------------------------------------------------------------------------------

# many COUNT [COMMAND]: a file of COUNT tasks
many() {
  "$PYTHON" -c 'import json, sys
print(json.dumps({"version": 1, "tasks": [
    {"name": f"Task number {i}", "app": "fleet", "owner": "root", "command": sys.argv[2],
     "schedule": {"type": "daily", "at": f"{i // 60 % 24:02}:{i % 60:02}"}} for i in range(int(sys.argv[1]))]}))' \
    "$1" "${2:-/usr/local/bin/collect --all}"
}

is_valid() {
  "$PYTHON" "$here/support/json_schema.py" "$@"
}

# milliseconds COMMAND...: the processor time that it takes, with its children
milliseconds() {
  "$PYTHON" -c 'import resource, subprocess, sys
subprocess.run(sys.argv[1:], check=True, stdout=subprocess.DEVNULL)
used = resource.getrusage(resource.RUSAGE_CHILDREN)
print(int((used.ru_utime + used.ru_stime) * 1000))' "$@"
}

crontab_fits() {
  { z status || true; } >said
  grep -q '^ok .*crontab is in step' said || { cat said; return 1; }
}

# ---- JSON -----------------------------------------------------------------------------------

what_it_tells_is_valid() {
  local options
  clean
  add --daily 08:30 --name old --app backup -- true
  for options in --dry-run "--dry-run --diff" --diff --diff ""; do
    set_of 02:30 >set.json
    # shellcheck disable=SC2086
    { z apply set.json --json --prune --app backup $options || true; } >out
    is_valid changes <out || { echo "$options"; return 1; }
  done
}

# ---- turns ----------------------------------------------------------------------------------

two_applies_take_turns() {
  local i
  clean
  for i in 1 2; do many 20 "true $i" >"set$i"; done
  for i in 1 2 1 2 1 2; do z apply "set$i" >"told$i" & done
  wait
  z export >out
  # Each as a whole, so that all tasks are of the one that was last.
  same "$("$PYTHON" -c 'import json; t = json.load(open("out"))["tasks"]; print(len(t), len({x["command"] for x in t}))')" "20 1" &&
    same "$(task_lines)" 20 && crontab_fits
}

an_apply_and_others_take_turns() {
  local i
  clean
  many 20 >set.json
  z apply set.json >told &
  for i in {1..5}; do add --daily 08:30 --name "own $i" -- true & done
  wait
  z apply set.json >told &
  for i in {1..5}; do z edit "own $i" --app-args "$i" >/dev/null & done
  wait
  same "$(z list --all --json | json 'len(tasks), sum(t["app_args"] is not None for t in tasks)')" "25 5" &&
    same "$(grep -c unchanged told)" 20 && crontab_fits
}

# It reads the tasks after it has taken the lock.
what_changed_while_it_waited_is_seen() {
  clean
  set_of 02:30 >set.json
  z apply set.json >told
  hold_lock /run/zelosched.lock
  "$ZELOSCHED" apply set.json >told &
  local apply=$!
  until readlink "/proc/$apply/fd/"* | grep -q zelosched.lock; do :; done
  edit_by_hand 's/^run min="30"/run min="31"/' # as another program does
  kill "$held"
  wait "$apply"
  same "$(head -1 told)" "task 1 (Backup) changed"
}

# ---- steps that fail ------------------------------------------------------------------------

# Two sets, for a task to be removed, one to be changed, one to be created and one that stays.
before_and_after() {
  clean
  file_of "$(one removed 01:00)" "$(one changed 02:00)" "$(one same 03:00)" >old
  file_of "$(one changed 04:00)" "$(one same 03:00)" "$(one created 05:00)" >new
  z apply new --prune --app fleet >/dev/null
  z export >exported.new
  clean
  z apply old >/dev/null
  z export >exported.old
  tar -cPf kept.tar "$STORE" "$PERSISTENT" "$LAST_GOOD" "$KEPT" /etc/crontab
}

one() {
  echo '{"name": "'"$1"'", "app": "fleet", "owner": "root", "schedule": {"type": "daily", "at": "'"$2"'"}, "command": "true"}'
}

as_before() {
  rm -f "$STORE"* /usr/zelo/etc/* /usr/zelo/var/*
  tar -xPf kept.tar
}

# is_old_or_new: each task that is stored, whatever became of the others
is_old_or_new() {
  "$PYTHON" - <<'PY'
import json, subprocess, os
def tasks(path):
    with open(path) as file: return {t["name"]: t for t in json.load(file)["tasks"]}
old, new, now = (tasks("exported." + name) for name in ("old", "new", "now"))
for name in old.keys() | new.keys() | now.keys():
    assert now.get(name) in (old.get(name), new.get(name)), name
PY
}

# fails_at_every_step ERROR
fails_at_every_step() {
  local step bad=0
  before_and_after
  for ((step = 1; step < 10000; step += STRIDE)); do
    as_before
    rm -f mark
    FAIL_STEP=$step FAIL_ERROR=$1 FAIL_MARK=$SCRATCH/mark LD_PRELOAD=$FAIL \
      try z apply new --prune --app fleet
    if [[ ! -e mark ]]; then break; fi
    if [[ $1 != kill && $status != 0 && $status != 1 ]]; then
      echo "step $step: status $status"
      bad=1
    fi
    if ! z export >exported.now 2>export.err || ! is_old_or_new; then
      echo "step $step: torn"
      cat export.err
      bad=1
    fi
    # After a success everything is done.
    if [[ $1 != kill && $status == 0 ]]; then
      cmp -s exported.now exported.new || { echo "step $step: not done, and not told"; bad=1; }
    fi
    try z apply new --prune --app fleet
    { [[ $status == 0 ]] && z export | cmp -s - exported.new && same "$(task_lines)" 3; } ||
      { echo "step $step: a second apply: $err"; bad=1; }
    ((bad == 0)) || return 1
  done
  echo "# $1: $((step - 1)) steps"
  ((step > 100))
}

# A signal from a terminal goes to the children too: here while /bin/cp has written a part of the
# working copy.
ends_between_changes() {
  local signal
  before_and_after
  cp /usr/bin/cp "$SCRATCH/whole_cp"
  cat >"$SCRATCH/slow_cp" <<'CP'
#!/bin/bash
if [[ $3 == /tmp/scheduled_tasks ]]; then
  head -c 700 "$2" >"$3"
  kill "-$SIGNAL" 0
fi
exec /run/zelosched_test/whole_cp "$@"
CP
  chmod 0755 "$SCRATCH/slow_cp"
  for signal in INT HUP TERM; do
    as_before
    mount -n --bind "$SCRATCH/slow_cp" /usr/bin/cp
    status=$(SIGNAL=$signal "$PYTHON" -c 'import os, signal, subprocess, sys
def begin():
    os.setsid()
    for number in (signal.SIGINT, signal.SIGHUP, signal.SIGTERM): signal.signal(number, signal.SIG_DFL)
print(subprocess.run(sys.argv[1:], preexec_fn=begin, stdout=subprocess.DEVNULL).returncode)' \
      "$ZELOSCHED" apply new --prune --app fleet)
    umount /usr/bin/cp
    same "$signal $status" "$signal -$(kill -l "$signal")" || return 1
    z export >exported.now && is_old_or_new || return 1
    z apply new --prune --app fleet >told && z export | cmp -s - exported.new || return 1
  done
}

# No stored task is lost, each task that could not be saved is reported, and with room the same file
# is applied whole.
a_full_disk_is_told() {
  clean
  many 50 "$(printf '%02000d' 0)" >set.json
  add --daily 08:30 --name own -- true
  leave_room /tmp 60000
  try z apply set.json --json
  leave_room /tmp
  same "$status $(grep -c '^zelosched: a task (Task number [0-9]*): cannot save the task' err) $(is_valid changes <out)" \
    "1 $(grep -c '"failed"' out) " && (($(grep -c '"created"' out) > 0 && $(grep -c '"failed"' out) > 0)) || return 1
  same "$(z list --all --json | json 'len(tasks)')" "$(($(grep -c '"created"' out) + 1))" || return 1
  z apply set.json >told
  same "$(grep -c unchanged told) $(z list --all --json | json 'len(tasks)') $(task_lines)" \
    "$(grep -c '"created"' out) 51 51"
}

# ---- cost -----------------------------------------------------------------------------------

is_quick() {
  local first again
  clean
  many 250 >set.json
  first=$(milliseconds "$ZELOSCHED" apply set.json)
  again=$(milliseconds "$ZELOSCHED" apply set.json)
  echo "# 250 tasks from nothing in $first ms, unchanged in $again ms"
  ((first <= 5000 && again <= 100))
}

start_zelosched_tests
transcripts zelosched_apply.txt
check "what it tells as JSON is what the schema says" what_it_tells_is_valid
check "several applies take turns, each as a whole" two_applies_take_turns
check "and so do an apply and those that add and edit" an_apply_and_others_take_turns
check "what changed while it waited is seen" what_changed_while_it_waited_is_seen
check "killed at any step, each task is old or new, and a second apply completes it" fails_at_every_step kill
check "a signal to all that it has started ends it between two changes" ends_between_changes
check "where any step fails once, it is told, and a second apply completes it" fails_at_every_step 5
check "a full disk is told for each task, and with room all is done" a_full_disk_is_told
if $IS_WATCHED; then
  skip "250 tasks take their time at most" "this build watches each call"
else
  check "250 tasks take their time at most" is_quick
fi
finish
