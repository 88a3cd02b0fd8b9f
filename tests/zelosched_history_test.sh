#!/bin/bash
# The history database: one of the first version is migrated to today's without loss, and keeps what
# other programs rely on.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"

# shellcheck source=tests/support/zelosched_test.sh
. "$here/support/zelosched_test.sh"


clean() {
  rm -rf /tmp/scheduled_tasks* /usr/zelo/etc/scheduled_tasks* "$STATUS"* /tmp/lock /usr/zelo/var
}

kept() {
  sql "$KEPT" "$@"
}

# With the statements of that version, and a row of each kind.
first_version() {
  clean
  mkdir -p /usr/zelo/var
  install -m 0600 /dev/null "$KEPT"
  kept <<'FIRST'
CREATE TABLE run(timestamp INTEGER NOT NULL, status_id INTEGER NOT NULL,
 pid INTEGER NOT NULL, task_id INTEGER NOT NULL, app TEXT NOT NULL,
 status_code INTEGER NOT NULL, comment TEXT NOT NULL, boot TEXT NOT NULL,
 PRIMARY KEY(timestamp, status_id, pid, task_id, app)) WITHOUT ROWID;
CREATE INDEX run_of_task ON run(task_id, timestamp);
CREATE TABLE up(boot TEXT NOT NULL, seen INTEGER NOT NULL);
CREATE TABLE missed(task_id INTEGER PRIMARY KEY, app TEXT NOT NULL, due INTEGER NOT NULL);
INSERT INTO run VALUES(1795161600, 1, 11, 1, 'a', 3, '', 'b1'), (1795161601, 2, 12, 1, 'a', 7, '5', 'b1'),
 (1795161602, 3, 13, 2, '', 6, '9', 'b1'), (1795161603, 4, 14, 2, '', 5, '19', 'b1'),
 (1795161604, 5, 15, 2, '', 4, '', 'b1'), (1795161605, 6, 16, 2, '', 1, '', 'b1'),
 (1795161606, 7, 17, 2, '', 2, '', 'b1'), (1795161607, 8, 18, 2, '', 0, '', 'b1'),
 (1795161608, 9, 19, 2, '', 99, '', 'b1'), (1795161600, 1, 11, 2, '', 3, '', 'b2');
INSERT INTO up VALUES('b2', 1795161609);
INSERT INTO missed VALUES(1, 'a', 1795161500);
PRAGMA user_version = 1;
FIRST
}

readonly CARRIED_OVER="1|1|a|2|1|0|
2|2||2|1|0|
3|1|a|2|2|5|
4|2||2|3||9
5|2||2|3||19
6|2||2|4||
7|2||2|9||
8|2||2|9||
9|2||2|4||
10|2||2|9||"

carries_every_run_over() {
  first_version
  z history >/dev/null
  same "$(sqlite3 "$KEPT" "SELECT run, task, app, state, outcome, exit_code, signal FROM run ORDER BY run")" "$CARRIED_OVER" &&
    same "$(kept "PRAGMA user_version; SELECT count(*), sum(told) FROM run; SELECT count(*) FROM sqlite_master WHERE name IN ('run_of_first', 'up', 'missed')")" \
      $'2\n10 10\n0'
}

shows_them() {
  first_version
  same "$(z history --json | python3 -c 'import json, sys
print([(r["run"], r["task"], r["outcome"]) for r in json.load(sys.stdin)["runs"]][-2:])')" \
    "[(2, 2, 'finished'), (1, 1, 'finished')]"
}

# Killed after 10 to 340 ms: the old version is there, or the new one.
a_migration_that_is_killed_leaves_one_of_both() {
  local i version bad=0
  for i in 1 2 3 5 8 13 21 34; do
    first_version
    timeout -s KILL "$(printf '0.%02d' "$i")" "$ZELOSCHED" history >/dev/null 2>&1 || true
    version=$(kept "PRAGMA user_version") || bad=1
    [[ $version == [12] && $(kept "SELECT count(*) FROM run") == 10 ]] || { echo "$i: $version"; bad=1; }
  done
  return "$bad"
}

an_earlier_one_is_used_whoever_is_first() {
  first_version
  local i
  for i in {1..10}; do z history >"$SCRATCH/out.$i" & done
  wait
  same "$(cat "$SCRATCH"/out.* | sort | uniq -c | awk '{ print $1 }' | sort -u)" 10
}

# The numbers of deleted runs are not used again.
no_number_comes_again() {
  clean
  z add --quiet --daily 08:30 -- true >/dev/null
  z run --wait 1 >/dev/null
  z run --wait 1 >/dev/null
  kept "DELETE FROM run"
  z run --wait 1 >/dev/null
  same "$(kept "SELECT run FROM run")" 3
}

check "a history of the first version is carried over whole" carries_every_run_over
check "and shown" shows_them
check "a change of the version that is killed leaves one or the other" a_migration_that_is_killed_leaves_one_of_both
check "ten at once change it once" an_earlier_one_is_used_whoever_is_first
check "no run gets the number of another" no_number_comes_again
finish
