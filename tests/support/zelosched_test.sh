# shellcheck shell=bash
# For the tests of zelosched, scripts and transcripts: the files it works with, running it, also at
# another time, and a machine on which all is well. What changes the sandbox for all of them is in
# start_zelosched_tests.
#
# Not every name is used by every test:
# shellcheck disable=SC2034

readonly ZELOSCHED=$BUILD_DIR/bin/zelosched
readonly FAKE=$BUILD_DIR/tests/fake_time.so
readonly NO_FORK=$BUILD_DIR/tests/no_fork.so
readonly SCRATCH=/run/zelosched_test
readonly STORE=/tmp/scheduled_tasks
readonly PROGRAM=/tmp/zeloschedtask
readonly STATUS=/tmp/sched_status.sqlite
readonly PERSISTENT=/usr/zelo/etc/scheduled_tasks
readonly LAST_GOOD=/usr/zelo/etc/scheduled_tasks.last-good
readonly KEPT=/usr/zelo/var/history.sqlite
readonly BOOT_ID=/proc/sys/kernel/random/boot_id
readonly ALARM=/sys/class/rtc/rtc0/wakealarm
readonly NOBODY=65534
unset LC_ALL LANG NO_COLOR
export TZ=UTC
mkdir -p "$SCRATCH"
cd "$SCRATCH" || exit

# A command that hangs fails.
z() {
  timeout 60 "$ZELOSCHED" "$@"
}

zelosched() {
  z "$@"
}

at() {
  local moment=$1
  shift
  FAKE_TIME=$(date -u -d "$moment" +%s) LD_PRELOAD=$FAKE z "$@"
}

# Sleeps return at once (support/fake_time.c).
patiently() {
  FAKE_PATIENCE=1 LD_PRELOAD=$FAKE "$@"
}

# Runs it and keeps status, out and err.
try() {
  status=0
  "$@" >"$SCRATCH/out" 2>"$SCRATCH/err" </dev/null || status=$?
  out=$(cat "$SCRATCH/out")
  err=$(cat "$SCRATCH/err")
}

add() {
  z add --quiet "$@" >/dev/null
}

# json EXPRESSION: prints it for the JSON on standard input; `tasks` are the members of its lists
json() {
  python3 -c "import json, sys
tasks = json.load(sys.stdin)
if 'version' in tasks and 'state' not in tasks:
    tasks = sum((value for value in tasks.values() if isinstance(value, list)), [])
print($1)"
}

# The library's JSON of tasks with its members decoded, as an array with an object a line.
plain() {
  z export --wire "$@" | python3 -c 'import base64, json, re, sys
objects = [{k: json.loads(v) for k, v in json.loads(line).items()} for line in sys.stdin]
for task in objects:
    command = base64.b64decode(task.pop("cmd"))
    try:
        task["cmd"] = command.decode()
    except UnicodeDecodeError:
        task["cmd base64"] = base64.b64encode(command).decode()
    for key, text in task.items():
        if re.fullmatch("id|owner|simple edit form|listable|can .*|start .*|run .*|repeat hour|last work hour", key):
            task[key] = int(text)
lines = [json.dumps(task, separators=(",", ":"), sort_keys=True) for task in objects]
print("[\n" + ",\n".join(lines) + "\n]")'
}

ids() {
  z list --power --json "$@" | json '[t["id"] for t in tasks]'
}

names() {
  z list --power | awk 'NR > 1 { print $2 }' | sort | paste -sd ' '
}

task_lines() {
  grep -c "$PROGRAM" /etc/crontab || true
}

owner_and_mode() {
  stat -c '%U:%G %a' "$@"
}

sql() {
  sqlite3 -separator ' ' "$@"
}

# Comments count like any other line. Of more than 10,000 lines cron reads none, and 200 are left to
# other programs and to power times.
fill_crontab() {
  local present
  present=$(wc -l </etc/crontab)
  yes '#' | head -n $(($1 - present)) >>/etc/crontab
}

# times COUNT: an array of COUNT copies of the object on standard input
times() {
  local object
  object=$(cat)
  echo "["
  yes "$object," | head -n "$(($1 - 1))"
  echo "$object]"
}

# file_of OBJECT...: a file of these tasks
file_of() {
  local IFS=,
  echo "{\"version\": 1, \"tasks\": [$*]}"
}

# set_of TIME: a file of two tasks, the first of them daily at that time
set_of() {
  file_of '{"name": "Backup", "app": "backup", "owner": "root", "schedule": {"type": "daily", "at": "'"$1"'"}, "command": "true"}' \
    '{"name": "Mail", "owner": "nobody", "schedule": {"type": "weekly", "days": ["mon", "fri"], "at": "08:00", "every_hours": 2, "until_hour": 18}, "command": "true"}'
}

# the_object [SED SCRIPT]: the one task of an export, as a member of an array
the_object() {
  sed '1d;$d' "$1" | sed "${2:-}"
}

# ---- the machine ----------------------------------------------------------------------------

# Once for all tests of a script.
start_zelosched_tests() {
  cp /etc/crontab "$SCRATCH/crontab"
  cat "$BOOT_ID" >"$SCRATCH/boot_id"
  mount -n --bind "$SCRATCH/boot_id" "$BOOT_ID"
  mount -n -t tmpfs sys /sys
  mkdir -p "${ALARM%/*}"
  touch "$ALARM"
  start_something_like_cron
}

start_something_like_cron() {
  cp /bin/sleep "$SCRATCH/cron"
  # No child of this shell, which waits for its own; ignores the library's SIGHUP.
  (
    trap '' HUP
    "$SCRATCH/cron" 10000 >/dev/null 2>&1 &
    echo $! >"$SCRATCH/crond.pid"
  )
}

# transcripts NAME...: runs them, with a line for each test; with $UPDATE_TRANSCRIPTS updates them
transcripts() {
  local tests
  tests=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd -P)
  python3 "$tests/support/transcript.py" ${UPDATE_TRANSCRIPTS:+--update} \
    "$tests/support/zelosched_test.sh" "${@/#/$tests/transcripts/}" || tests_failed=1
}

forget_tmp() {
  rm -rf "$STORE"* "$PROGRAM"* "$STATUS"* /tmp/lock* /tmp/zeloscheduler.*
}

# Keepers of earlier tests would write into the history of the next.
end_keepers() {
  local keeper
  for keeper in $(pgrep -x zeloschedtask || true); do kill -9 "$keeper" 2>/dev/null || true; done
}

# No task, and no traces of earlier tests.
clean() {
  end_keepers
  forget_tmp
  rm -rf "$PERSISTENT" "$LAST_GOOD" /usr/zelo/var /usr/zelo/etc/power_sched.conf /etc/crontab
  cp "$SCRATCH/crontab" /etc/crontab
  cp "$SCRATCH/crond.pid" /var/run/crond.pid
  : >"$ALARM"
}

# One task, of which status finds nothing wrong.
all_well() {
  add --daily 08:30 -- true
  install -m 0755 "$BUILD_DIR/bin/zeloschedtask" "$PROGRAM"
}

# edit_by_hand SCRIPT: edits the store by sed, and drops its header and trailer. With a header and a
# wrong trailer it would look like a copy in progress, which readers wait for.
edit_by_hand() {
  sed -i -e "$1" -e '/^# zelo section file$/d; /^# end of file/d' "$STORE"
}

# many_tasks COUNT: each minute of the hour in turn
many_tasks() {
  add --daily 08:30 -- true
  grep '=' "$STORE" >"$SCRATCH/keys"
  for ((id = 1; id <= $1; id++)); do
    echo "[$id]"
    sed "s/^id=.*/id=\"$id\"/; s/^run min=.*/run min=\"$((id % 60))\"/" "$SCRATCH/keys"
  done >"$STORE"
}

# Boots: /tmp is empty, and the crontab is as it was.
boot() {
  forget_tmp
  cat /proc/sys/kernel/random/uuid >"$SCRATCH/boot_id"
}

# come_up MOMENT: boots, and restores the tasks at that moment
come_up() {
  boot
  FAKE_STARTED=$(($(date -u -d "$1" +%s) - 40))
  export FAKE_STARTED
  at "$1" restore >/dev/null
}

# hold PATH: a mount point, which not even root can rename, until let_go PATH
hold() {
  rm -rf "$1"
  mkdir "$1"
  mount -n -t tmpfs -o mode=0777 none "$1"
}

let_go() {
  umount -n "$1"
  rmdir "$1"
}

state() {
  cat "$STORE" "$PERSISTENT" /etc/crontab 2>&1 | sha256sum
}

# remember, COMMAND, is_unchanged
remember() {
  state >"$SCRATCH/state"
}

is_unchanged() {
  state | cmp - "$SCRATCH/state"
}

# A copy of zelosched that every user can run, also when the checkout is in a directory that others
# cannot enter. A build for coverage has a place for its counts.
readonly FOR_OTHERS=/run/for_others/zelosched
copy_for_others() {
  local directory=${FOR_OTHERS%/*}
  mkdir -p "$directory"
  mkdir -m 0777 "$directory/counts"
  cp "$BUILD_DIR"/lib/*.so* "$directory"
  cp "$ZELOSCHED" "$directory/zelosched.program"
  cat >"$FOR_OTHERS" <<SCRIPT
#!/bin/sh
GCOV_PREFIX=$directory/counts LD_LIBRARY_PATH=$directory exec $directory/zelosched.program "\$@"
SCRIPT
  chmod -R a+rX "$directory"
  chmod a+x "$FOR_OTHERS"
}

as_nobody() {
  setpriv --reuid "$NOBODY" --regid "$NOBODY" --clear-groups "$@"
}

nobodys_zelosched() {
  [[ -e $FOR_OTHERS ]] || copy_for_others
  as_nobody "$FOR_OTHERS" "$@"
}

# ---- tasks and runs -------------------------------------------------------------------------

three_tasks() {
  add --daily 08:30 --name later -- true
  add --daily 07:30 --name sooner --app backup --owner nobody -- true
  add --daily 06:30 --name off --disabled -- true
}

one_recorded_run() {
  all_well
  z run --wait 1 >/dev/null
}

# hold_lock FILE: starts process $held, which holds a lock on the file until it is killed
hold_lock() {
  flock --no-fork "$1" sleep 600 >/dev/null 2>&1 &
  held=$!
  until ! flock --nonblock "$1" true; do :; done
}

# Prints what bash would offer for the line.
completions() {
  PATH=$BUILD_DIR/bin:$PATH bash -c '
    source <(zelosched completion bash)
    COMP_WORDS=("$@")
    COMP_CWORD=$(($# - 1))
    _zelosched
    printf "%s\n" "${COMPREPLY[@]}"' - "$@"
}

commands() {
  z --help | sed -n 's/^  \([a-z-]*\) .*/\1/p'
}

# With 256 MB of address space, too little for a program with sanitizers.
bounded() {
  (
    if ! grep -q __asan_init "$ZELOSCHED"; then ulimit -v 262144; fi
    "$@"
  )
}

# ---- boots ----------------------------------------------------------------------------------

saved() {
  add --daily 02:30 --name one -- true
  add --daily 03:30 --name two -- true
}

three_saved() {
  saved
  add --daily 04:30 --name three -- true
}

# The type of a file, and of a regular one its checksum: reading a FIFO would not end.
contents_of() {
  stat -c %F "$1" 2>/dev/null || true
  if [[ -f $1 ]]; then md5sum <"$1"; fi
}

# leave_room MOUNT [BYTES]: leaves that much room in a tmpfs, or makes it as large as usual
leave_room() {
  local used size=50%
  used=$(df --output=used -B1 "$1" | tail -1)
  if (($# > 1)); then size=$((used + $2)); fi
  mount -n -o "remount,size=$size" "$1"
}

make_readonly() {
  mount -n --bind "$1" "$1"
  mount -n -o remount,bind,ro "$1"
}

# A copy of zelosched in a directory of its own, where a test chooses the zeloschedtask beside it.
elsewhere() {
  rm -rf /run/elsewhere
  mkdir /run/elsewhere
  cp "$ZELOSCHED" /run/elsewhere
}

elsewhere_zelosched() {
  LD_LIBRARY_PATH=$BUILD_DIR/lib /run/elsewhere/zelosched "$@"
}

# Files with names like those that a killed writer leaves
scratch_names() {
  find /tmp /run /usr/zelo/etc -name '*.??????' -not -name 'zeloscheduler.*' -not -name '*.sqlite' |
    grep -v -e "^$BUILD_DIR" -e "^${FOR_OTHERS%/*}"
}

names_in_tmp() {
  find /tmp/lock "$STATUS" "$STATUS"-* -printf '%p %u:%g %m %y\n' 2>/dev/null | sort
}

# record ID START STATUS [COMMENT [STATUS_ID [PID]]]: adds a row to the status database
record() {
  if [[ ! -s $STATUS ]]; then
    install -m 0600 /dev/null "$STATUS"
    sql "$STATUS" "CREATE TABLE if not exists task_status(status_id INTEGER PRIMARY KEY ASC, pid INTEGER, timestamp INTEGER, app STRING, task_id INTEGER, status_code INTEGER, comment STRING);"
  fi
  sql "$STATUS" "INSERT INTO task_status VALUES(${5:-NULL}, ${6:-4194305},
    $(date -u -d "$2" +%s), 'app', $1, $3, '${4:-}')"
}

readonly NOW="2026-11-20 12:00"
keep() {
  at "$NOW" history --keep
}

history() {
  z history --json "$@" | python3 -c 'import json, sys
for run in json.load(sys.stdin)["runs"]:
    words = [run["outcome"] or run["state"], run["exit_code"] or run["signal"] or ""]
    print(run["task"], run["start"][:19].replace("T", " "), " ".join(map(str, words)).strip(), sep=", ")'
}

# Off from one to eight o'clock on a Friday.
readonly ADDED="2026-11-20 01:00:10" OFF="2026-11-20 01:00:20" ON="2026-11-20 08:00:40"
readonly LATER="2026-11-20 08:05"
go_off() {
  at "$OFF" history --keep
  come_up "$ON"
}

missed() {
  at "$LATER" catch-up --dry-run "$@" | sed -n 's/^task [0-9]* (\(.*\)) was due at \(.*\): would.*/\1 \2/p'
}

before() {
  at "$ADDED" add --quiet "$@" >added
}

one_task() {
  before --daily 02:30 --name one -- true
}

# program_to_tell NAME COMMANDS: what is run when a run has ended.
program_to_tell() {
  install -d -m 0755 /etc/zelosched /etc/zelosched/run-ended.d
  printf '#!/bin/sh\n%s\n' "$2" >"/etc/zelosched/run-ended.d/$1"
  chmod 0755 "/etc/zelosched/run-ended.d/$1"
}

# What status says of the runs at a moment.
says_of_runs() {
  at "$1" status | grep -E '^[a-z]+ +(task [0-9]+ |no run was |no task)'
}

tasks_of_all_kinds() {
  rm -f ran
  before --daily 02:30 --name daily -- "echo daily >>$SCRATCH/ran"
  before --daily 00:15 --every 1h --until 23 --name hourly -- \
    "echo hourly >>$SCRATCH/ran"
  before --once 2026-11-20T03:00 --name once -- "echo once >>$SCRATCH/ran"
  before --weekly fri 08:00 --name weekly -- "echo weekly >>$SCRATCH/ran"
  before --daily 01:00 --name before -- true
  before --daily 08:04 --name after -- true
  before --weekly sat 04:00 --name saturday -- true
  before --daily 05:00 --disabled --name disabled -- true
  z power add on --daily 05:00 >/dev/null
}

# ran COUNT: what commands wrote into the file ran, once it has COUNT lines
ran() {
  local tenths
  for ((tenths = 0; tenths < 200; tenths++)); do
    if [[ $(wc -l <ran) -ge $1 ]]; then break; fi
    sleep 0.1
  done 2>/dev/null
  sort ran
}
