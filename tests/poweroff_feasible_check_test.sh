#!/bin/bash
# The program that cron starts at a power-off time, as it is installed and put where the crontab
# names it.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"

readonly INSTALLED=/usr/zelo/bin/zelo_poweroff_feasible_check
readonly DATABASE=/tmp/sched_status.sqlite
readonly GONE=4194305 # above the kernel's largest process id

install_it() {
  DESTDIR=/tmp/staged cmake -DCMAKE_INSTALL_PREFIX=/usr \
    -P "$BUILD_DIR/packaging/cmake_install.cmake" >/dev/null
  install -D -t "$(dirname "$INSTALLED")" "/tmp/staged/usr/libexec/zelosched/$(basename "$INSTALLED")"
}

sql() {
  sqlite3 "$DATABASE" "$1"
}

# run_row PID TASK STATUS [APP]
run_row() {
  sql "INSERT INTO task_status(pid, timestamp, app, task_id, status_code)
       VALUES($1, 0, '${4:-app}', $2, $3)"
}

empty_table() {
  rm -f "$DATABASE"
  sql "CREATE TABLE task_status(status_id INTEGER PRIMARY KEY ASC, pid INTEGER, timestamp INTEGER,
       app STRING, task_id INTEGER, status_code INTEGER, comment STRING)"
}

# "STATUS OUTPUT"
outcome() {
  local status=0 output
  output=$("$@" 2>&1) || status=$?
  echo "$status $output"
}

# A child that ends once its parent has become a program that never asks how it ended.
start_zombie() {
  bash -c 'sleep 1000 & echo $$ $!; exec sleep 1000' &
}

wait_until() {
  local tenths
  for ((tenths = 0; tenths < 100; tenths++)); do
    if "$@"; then return 0; fi
    sleep 0.1
  done
  echo "never: $*"
  return 1
}

is_sleep() {
  [[ $(cat "/proc/$1/comm") == sleep ]]
}

is_zombie() {
  grep -q '^State:.Z' "/proc/$1/status"
}

check "it is installed as a program" install_it
check "without a status database the machine may go off" same "$(outcome "$INSTALLED")" "0 "
sql "PRAGMA user_version = 1"
check "without a run ever recorded the machine may go off" same "$(outcome "$INSTALLED")" "0 "
empty_table
check "without a run the machine may go off" same "$(outcome "$INSTALLED")" "0 "

sleep 1000 &
live=$!
run_row "$live" 7 3
check "a run that has ended does not count" same "$(outcome "$INSTALLED")" "0 "
run_row "$GONE" 8 2
check "a run whose process is gone does not count" same "$(outcome "$INSTALLED")" "0 "
run_row -1 8 2
run_row 0 8 2
check "a number that is no process does not count" same "$(outcome "$INSTALLED")" "0 "
run_row $$ 9 2 ZELO.TOV.TaskScheduler.AutoPower
check "the power-off run that started the check does not count" \
  same "$(outcome "$INSTALLED")" "0 "
run_row "$live" 9 2 ZELO.TOV.TaskScheduler.AutoPower
check "another power-off run does" same "$(outcome "$INSTALLED")" \
  "1 task 9 is running as process $live (ZELO.TOV.TaskScheduler.AutoPower)"
empty_table
run_row $$ 9 2
check "a task's run that started the check does count" same "$(outcome "$INSTALLED")" \
  "1 task 9 is running as process $$ (app)"
empty_table
exec {zombies}< <(start_zombie)
read -r parent zombie <&"$zombies"
wait_until is_sleep "$parent"
kill "$zombie"
wait_until is_zombie "$zombie"
run_row "$zombie" 10 2
check "a run whose process is a zombie does not count" same "$(outcome "$INSTALLED")" "0 "
run_row "$live" 11 2 "it''s; \$(touch /tmp/broken) '||char(10)||'an app"
check "a live run is in the way, and told" same "$(outcome "$INSTALLED")" \
  "1 task 11 is running as process $live (it's; \$(touch /tmp/broken)  an app)"
check "what an application calls itself is not run" test ! -e /tmp/broken
run_row "$live" 12 2
empty_table
run_row "$live" 13 2 "a\\tb\\c' || char(27) || '[2J' || char(9, 7, 13, 127, 155, 228) || '"
check "nothing in what an application calls itself reaches a terminal as a command" \
  same "$(outcome "$INSTALLED" | od -An -c)" \
  "$(printf '1 task 13 is running as process %s (%s)\n' "$live" 'a\tb\c?[2J?? ?????' | od -An -c)"
empty_table
run_row "$live" 11 2
run_row "$live" 12 2
check "every live run is told" same "$(outcome "$INSTALLED" | wc -l)" 2

# What another user may have put there before the first run.
plant_view() {
  rm -f "$DATABASE"
  sql "CREATE VIEW task_status AS SELECT edit('x', '/tmp/evil') AS pid, 1 AS task_id, 'a' AS app,
       2 AS status_code"
}
printf '#!/bin/sh\ntouch /tmp/evil_was_run\n' >/tmp/evil
chmod +x /tmp/evil
plant_view
outcome "$INSTALLED" >/dev/null
check "a database that starts a program does not start it" test ! -e /tmp/evil_was_run
if ((EUID == 0)) && chown 65534 "$DATABASE" 2>/dev/null; then
  check "another user's database is in the way, and not opened" same "$(outcome "$INSTALLED")" \
    "1 $DATABASE is not this user's own file"
else
  skip "another user's database is in the way, and not opened" "needs other users"
fi
for plant in "mkfifo $DATABASE" "mkdir $DATABASE" "ln -s /nonexistent $DATABASE"; do
  rm -rf "$DATABASE"
  $plant
  check "${plant%% *}: what is no file is in the way, and not opened" \
    same "$(outcome timeout 10 "$INSTALLED")" "1 $DATABASE is not this user's own file"
done
rm -rf "$DATABASE"
empty_table
ln "$DATABASE" /tmp/elsewhere.sqlite
rm "$DATABASE"
ln -s /tmp/elsewhere.sqlite "$DATABASE"
check "nor is a link to one of our own" same "$(outcome "$INSTALLED")" \
  "1 $DATABASE is not this user's own file"
rm "$DATABASE"

# SQLite reads these beside the database, and would believe them.
empty_table
for beside in journal wal shm; do
  mkfifo "$DATABASE-$beside"
  check "a planted $beside is neither opened nor in the way" \
    same "$(outcome timeout 10 "$INSTALLED")" "0 "
  rm "$DATABASE-$beside"
done

mkdir -p /tmp/lock
touch /tmp/lock/lock_sched_run
(exec 8</tmp/lock/lock_sched_run; flock 8; sleep 100) &
holder=$!
until ! flock -n /tmp/lock/lock_sched_run true; do :; done
check "a run that is being recorded for too long is in the way" \
  same "$(outcome timeout 20 "$INSTALLED")" "1 a run is being recorded"
pkill -P "$holder" || true
kill "$holder" 2>/dev/null || true
wait "$holder" || true
check "without them the machine may go off" same "$(outcome "$INSTALLED")" "0 "

echo "no database" >"$DATABASE"
check "a database that cannot be read is in the way" \
  same "$(outcome "$INSTALLED" | tail -n 1)" "cannot read $DATABASE"
check "and is told by the exit status" same "$(outcome "$INSTALLED" | head -c 1)" 1
finish
