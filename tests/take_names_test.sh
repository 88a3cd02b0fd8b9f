#!/bin/bash
# The program by which package scripts and boot steps make the names in /tmp root's.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"

readonly TAKE=$BUILD_DIR/bin/take-names
readonly STORE=/tmp/scheduled_tasks
readonly KEPT=/usr/zelo/etc/scheduled_tasks
readonly PROGRAM=/tmp/zeloschedtask
readonly DATABASE=/tmp/sched_status.sqlite
readonly NOBODY=65534
readonly NAMES=("$STORE" "$PROGRAM" /tmp/lock /tmp/lock/lock_sched_run "$DATABASE" "$DATABASE-journal")
readonly ALL_ROOTS="644 0 regular $STORE
755 0 regular $PROGRAM
755 0 directory /tmp/lock
600 0 regular /tmp/lock/lock_sched_run
600 0 regular $DATABASE
600 0 regular $DATABASE-journal"

forget() {
  rm -rf "${NAMES[@]}" "$KEPT" /tmp/zeloscheduler.*
}

# "MODE OWNER KIND NAME" of each
standing() {
  stat -c '%a %u %F %n' "${NAMES[@]}" | sed -e 's/ regular empty file / regular /' -e 's/ regular file / regular /'
}

# "STATUS OUTPUT"
outcome() {
  local status=0 output
  output=$("$@" 2>&1) || status=$?
  echo "$status $output"
}

# Prints the contents of what was moved away from a name
moved_from() {
  cat /tmp/zeloscheduler.*/"$(basename "$1")"
}

is_stand_in() {
  cmp "$PROGRAM" "$here/../packaging/zeloschedtask.stand-in"
}

others_exist() {
  local probe=/tmp/probe status=0
  touch "$probe"
  chown "$NOBODY" "$probe" 2>/dev/null || status=1
  rm -f "$probe"
  return "$status"
}

# ---- free names

forget
check "free names are taken without a word" same "$(outcome "$TAKE")" "0 "
check "each with its mode, as root's" same "$(standing)" "$ALL_ROOTS"
check "the program is the stand-in" is_stand_in
check "the store is left for a restore to fill" same "$(stat -c %s "$STORE")" 0
echo "a task" >"$STORE"
echo "rows" >"$DATABASE"
check "what is root's already stays" same \
  "$(outcome "$TAKE") $(cat "$STORE") $(cat "$DATABASE")" "0  a task rows"

# ---- another user's

if ((EUID == 0)) && others_exist; then
  forget
  for name in "$STORE" "$PROGRAM" "$DATABASE"; do
    echo "his" >"$name"
    chown "$NOBODY" "$name"
  done
  mkdir /tmp/lock
  chown "$NOBODY" /tmp/lock
  check "another user's are taken from him" same "$(outcome "$TAKE" | head -c 1) $(standing)" \
    "0 $ALL_ROOTS"
  for name in "$STORE" "$PROGRAM" "$DATABASE"; do
    check "his $(basename "$name") is where only root can enter" same "$(moved_from "$name")" his
  done
  check "no other user enters these" same "$(stat -c %a /tmp/zeloscheduler.* | sort -u)" 700

  # The checkout may be closed to others.
  mkdir /run/for_others
  cp "$TAKE" "$BUILD_DIR"/lib/*.so* /run/for_others
  check "without root's rights it takes nothing and says why" same \
    "$(forget; outcome setpriv --reuid "$NOBODY" --clear-groups \
      env LD_LIBRARY_PATH=/run/for_others /run/for_others/take-names; ls -A /tmp)" \
    "1 take-names: that takes root's rights"
else
  skip "another user's are taken from him" "needs other users"
  skip "without root's rights it takes nothing and says why" "needs other users"
fi

# ---- a first installation

forget
for name in "$STORE" "$PROGRAM" "$DATABASE"; do echo "planted" >"$name"; done
check "at first, what is root's is replaced too" same "$(outcome "$TAKE" --anew)" "0 "
check "by what is made here" same "$(standing)" "$ALL_ROOTS"
check "also the program" is_stand_in
check "also the database" same "$(cat "$DATABASE")" ""
check "without a persistent copy the store has no task" same "$(cat "$STORE")" \
  "# The scheduler's tasks."

forget
mkdir -p "$(dirname "$KEPT")"
echo "a task" >"$KEPT"
echo "a task" >"$STORE"
before=$(stat -c %i "$STORE")
check "a store that is as the persistent copy stays" same \
  "$(outcome "$TAKE" --anew) $(stat -c %i "$STORE") $(cat "$STORE")" "0  $before a task"
echo "another task" >"$STORE"
check "one that differs makes room for what a restore fills" same \
  "$(outcome "$TAKE" --anew) $(stat -c %s "$STORE")" "0  0"
forget
echo "a task" >"$KEPT"
cp "$KEPT" "$STORE"
chmod 666 "$STORE"
check "one that is equal but can be written by others does so too" same \
  "$(outcome "$TAKE" --anew | head -c 1) $(stat -c '%a %s' "$STORE")" "0 644 0"
check "and is told where it is" same "$(moved_from "$STORE")" "a task"

forget
echo "a task" >"$KEPT.last-good"
: >"$KEPT"
check "where the persistent copy was cut off it makes room for what a restore fills, too" same \
  "$(outcome "$TAKE" --anew) $(stat -c %s "$STORE")" "0  0"
rm -f "$KEPT.last-good"

forget
echo "a task" >"$KEPT"
echo "another task" >"$STORE"
flock --no-fork /run/zeloscheduler.lock sleep 600 &
until ! flock --nonblock /run/zeloscheduler.lock true; do :; done
check "no store is replaced while tasks are changed" same \
  "$(FAKE_PATIENCE=1 LD_PRELOAD=$BUILD_DIR/tests/fake_time.so outcome "$TAKE" --anew) $(cat "$STORE")" \
  "1 take-names: changes of tasks are locked: the system log says by whom another task"
kill $!
rm /run/zeloscheduler.lock

forget
mkdir -p "$DATABASE/inside"
check "what is moved away is named" same \
  "$(outcome "$TAKE" --anew | sed 's/zeloscheduler\.[^/]*/NEW/')" \
  "0 take-names: what was $DATABASE is now /tmp/NEW/$(basename "$DATABASE")"

# ---- the stand-in alone

forget
echo "the program of a package that goes" >"$PROGRAM"
check "the stand-in takes the program's place" same "$(outcome "$TAKE" --stand-in)" "0 "
check "it is the stand-in then" is_stand_in
check "no other name is touched" same "$(ls -A /tmp)" "$(basename "$PROGRAM")"

# ---- wrong usage, and no way to do it

forget
readonly USAGE="2 usage: take-names [--anew | --stand-in]"
check "an unknown option is refused" same "$(outcome "$TAKE" --all)" "$USAGE"
check "an empty one too" same "$(outcome "$TAKE" '')" "$USAGE"
check "more than one too" same "$(outcome "$TAKE" --anew --stand-in)" "$USAGE"
check "nothing is taken then" same "$(ls -A /tmp)" ""

limited() (
  trap '' XFSZ
  ulimit -f 0
  exec "$TAKE" "$@"
)
check "what could not be had is told, and the rest is taken" same "$(outcome limited)" \
  "1 take-names: cannot take $PROGRAM: File too large"
check "so that only this is missing" same "$(standing 2>/dev/null | cut -d' ' -f4)" \
  "$(printf '%s\n' "${NAMES[@]}" | grep -vx "$PROGRAM")"
finish
