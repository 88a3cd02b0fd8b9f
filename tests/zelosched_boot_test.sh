#!/bin/bash
# What the administrator's program does around a boot: it puts the tasks back into /tmp, keeps the
# history, and makes up for what was missed while the machine was off.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"
# shellcheck source=tests/support/zelosched_test.sh
. "$here/support/zelosched_test.sh"

readonly SCRATCH=/run/zelosched_boot_test
readonly STORE=/tmp/scheduled_tasks
readonly PROGRAM=/tmp/zeloschedtask
readonly PERSISTENT=/usr/zelo/etc/scheduled_tasks
readonly LAST_GOOD=/usr/zelo/etc/scheduled_tasks.last-good
readonly STATUS=/tmp/sched_status.sqlite
readonly KEPT=/usr/zelo/var/history.sqlite
readonly NO_FORK=$BUILD_DIR/tests/no_fork.so
readonly BOOT_ID=/proc/sys/kernel/random/boot_id
readonly NOBODY=65534
unset LC_ALL LANG NO_COLOR
export TZ=UTC
mkdir -p "$SCRATCH"
cp /etc/crontab "$SCRATCH/crontab"
cat "$BOOT_ID" >"$SCRATCH/boot_id"
mount -n --bind "$SCRATCH/boot_id" "$BOOT_ID"

# ---- helpers --------------------------------------------------------------------------------

# What takes other users' files, or a file system made smaller.
check_as_root() {
  if grep -qE '^ *0 +0 +[0-9]{2,}' /proc/self/uid_map; then
    check "$@"
  else
    skip "$1" "this sandbox has no user but 0"
  fi
}

# The status, and a part of what is said on standard error.
says() {
  [[ $status == "$1" && $err == *"$2"* ]] ||
    { printf 'status %s\nout: %s\nerr: %s\nwanted %s: %s\n' "$status" "$out" "$err" "$1" "$2"; return 1; }
}

# The usage is told, and nothing is done.
is_refused_as() {
  local why=$1
  shift
  try z "$@"
  says 2 "$why" && says 2 "usage: zelosched $1"
}

explains() {
  local command=$1 option
  shift
  try z "$command" --help
  is_done || return 1
  for option; do
    grep -q -e "^  $option " <<<"$out" || { echo "$command --help lacks $option"; return 1; }
  done
}

is_done() {
  [[ $status == 0 && -z $err ]] || { printf 'status %s\nerr: %s\n' "$status" "$err"; return 1; }
}

forget_tmp() {
  rm -rf "$STORE"* "$PROGRAM"* "$STATUS"* /tmp/lock* /tmp/zeloscheduler.*
}

clean() {
  forget_tmp
  rm -rf "$PERSISTENT" "$LAST_GOOD" /usr/zelo/var /usr/zelo/etc/power_sched.conf
  cp "$SCRATCH/crontab" /etc/crontab
}

# The machine comes up: /tmp is empty, and the crontab is as it was.
boot() {
  forget_tmp
  cat /proc/sys/kernel/random/uuid >"$SCRATCH/boot_id"
}

add() {
  z add --quiet "$@" >/dev/null
}

names() {
  z list | awk 'NR > 1 { print $NF }' | sort | tr '\n' ' '
}

owner_and_mode() {
  stat -c '%U:%G %a' "$1"
}

task_lines() {
  grep -c "$PROGRAM" /etc/crontab || true
}

sql() {
  sqlite3 -separator ' ' "$@"
}

# ---- restore --------------------------------------------------------------------------------

saved() {
  clean
  add --daily 02:30 --name one -- true
  add --daily 03:30 --name two -- true
}

restores_after_a_boot() {
  saved
  boot
  try z restore
  is_done && same "$(names)" "one two " && cmp "$STORE" "$PERSISTENT"
}

puts_all_back_as_roots() {
  same "$(owner_and_mode "$STORE"), $(owner_and_mode "$PROGRAM")" "root:root 644, root:root 755" &&
    cmp "$PROGRAM" "$BUILD_DIR/bin/zeloschedtask"
}

synchronises() {
  saved
  boot
  cp "$SCRATCH/crontab" /etc/crontab
  try z restore
  is_done && same "$(task_lines)" 2
}

is_quiet_when_nothing_was_saved() {
  clean
  boot
  try z restore
  is_done && [[ -x $PROGRAM && -e $STORE && ! -s $STORE ]]
}

# Three tasks in both copies, of which the persistent one is then damaged by "$@".
damaged() {
  saved
  add --daily 04:30 --name three -- true
  "$@"
  boot
}

# What it is, and of a file what is in it. Reading a FIFO would not end.
persistent_copy() {
  stat -c %F "$PERSISTENT" 2>/dev/null || true
  if [[ -f $PERSISTENT ]]; then md5sum <"$PERSISTENT"; fi
}

falls_back_on_the_last_good() {
  local why=$1
  shift
  damaged "$@"
  local before
  before=$(persistent_copy)
  try z restore
  says 1 "$why" && says 1 "The tasks are those of $LAST_GOOD" && same "$(names)" "one three two " &&
    same "$(persistent_copy)" "$before" && same "$(task_lines)" 3 && [[ -x $PROGRAM ]]
}

# The last good copy has every change that was acknowledged, so nothing is left to be done.
is_made_whole() {
  local why=$1
  shift
  damaged "$@"
  try z restore
  says 0 "$why" && says 0 "all copies agree again" && same "$(names)" "one three two " &&
    cmp "$PERSISTENT" "$LAST_GOOD" && cmp "$PERSISTENT" "$STORE" && same "$(task_lines)" 3
}

cut_off() {
  truncate -s -40 "$PERSISTENT"
}

cut_to_nothing() {
  truncate -s 0 "$PERSISTENT"
}

zero() {
  truncate -s 0 "$PERSISTENT"
  truncate -s 900 "$PERSISTENT"
}

zero_the_end() {
  truncate -s +300 "$PERSISTENT"
}

overwrite() {
  echo 'Dear diary' >"$PERSISTENT"
}

give_away() {
  chown "$NOBODY" "$PERSISTENT"
}

share() {
  chmod 0666 "$PERSISTENT"
}

remove() {
  rm "$PERSISTENT"
}

make_directory() {
  rm "$PERSISTENT"
  mkdir "$PERSISTENT"
}

make_fifo() {
  rm "$PERSISTENT"
  mkfifo "$PERSISTENT"
}

# Three tasks in both copies, of which the persistent one is then damaged by "$@".
damaged_inside() {
  saved
  add --daily 04:30 --name three -- true
  z restore >/dev/null
  cp "$LAST_GOOD" "$SCRATCH/good"
  "$@"
  boot
  try z restore
  cmp "$LAST_GOOD" "$SCRATCH/good"
}

is_refused_for_the_last_good() {
  damaged_inside "$@" && says 1 "$PERSISTENT is not as it was written" &&
    says 1 "The tasks are those of $LAST_GOOD" && same "$(names)" "one three two "
}

is_used_without_a_last_good_copy() {
  saved
  lose_a_key
  rm "$LAST_GOOD"
  boot
  try z restore
  says 1 "It was used all the same" && [[ ! -e $LAST_GOOD ]] && same "$(names)" "two "
}

is_used_all_the_same() {
  damaged_inside "$@" && says 1 "$PERSISTENT is not as it was written: its checksum does not fit. It was used all the same" &&
    cmp "$STORE" "$PERSISTENT" && same "$(names)" "one three tow " || return 1
  add --daily 05:30 -- true
  boot
  try z restore
  is_done && cmp "$LAST_GOOD" "$PERSISTENT"
}

change_a_letter() {
  sed -i 's/^name="two"/name="tow"/' "$PERSISTENT"
}

# One task's keys are gone, its section is there.
lose_a_key() {
  sed -i '0,/^run hour=/s//run_hour=/' "$PERSISTENT"
}

write_over_the_middle() {
  head -c 512 /dev/zero | tr '\0' x | dd of="$PERSISTENT" bs=1 seek=600 conv=notrunc status=none
}

lose_the_header_and_the_end() {
  printf X | dd of="$PERSISTENT" conv=notrunc status=none
  truncate -s 700 "$PERSISTENT"
}

gives_up_without_a_good_copy() {
  damaged cut_off
  truncate -s -40 "$LAST_GOOD"
  try z restore
  says 1 "neither can be used" && [[ -e $STORE && ! -s $STORE && -x $PROGRAM ]]
}

gives_up_without_a_last_good_copy() {
  damaged cut_off
  rm "$LAST_GOOD"
  try z restore
  says 1 "there is no $LAST_GOOD: no task will run" && [[ ! -s $STORE ]]
}

keeps_what_stands() {
  saved
  cp "$PERSISTENT" "$SCRATCH/older"
  add --daily 04:30 --name three -- true
  cp "$SCRATCH/older" "$PERSISTENT"
  try z restore
  is_done && same "$(names)" "one three two " && cmp "$LAST_GOOD" "$SCRATCH/older"
}

replaces_by_force() {
  try z restore --force
  is_done && same "$(names)" "one two " && same "$(task_lines)" 2
}

not_even_by_force() {
  saved
  truncate -s -40 "$PERSISTENT"
  try z restore --force
  same "$status $(names)" "0 one two " && cmp "$PERSISTENT" "$STORE" && cmp "$LAST_GOOD" "$STORE" &&
    [[ $err == *"$PERSISTENT"*"it was written anew from $STORE"* ]]
}

# What it holds may be somebody's work: a save takes it up or not, a restore does not decide that.
leaves_what_was_changed_by_hand() {
  saved
  sed -i 's/"one"/"changed"/' "$PERSISTENT"
  cp "$PERSISTENT" "$SCRATCH/changed"
  try z restore
  says 1 "save a task, which writes it anew" && cmp "$PERSISTENT" "$SCRATCH/changed"
}

# "$@" plants something once /tmp is empty.
boot_with() {
  saved
  boot
  echo untouched >"$SCRATCH/victim"
  "$@"
}

replaces_what_is_not_ours() {
  local why=$1
  shift
  boot_with "$@"
  try z restore
  [[ $status == 0 && $err == *"$STORE $why"*": it is not used"* ]] || { echo "$status $err"; return 1; }
  same "$(names), $(owner_and_mode "$STORE"), $(cat "$SCRATCH/victim")" \
    "one two , root:root 644, untouched"
}

plant_file() {
  cp "$PERSISTENT" "$STORE"
  chown "$NOBODY" "$STORE"
}

plant_shared() {
  install -m 0666 "$PERSISTENT" "$STORE"
}

plant_link() {
  ln -s "$SCRATCH/victim" "$STORE"
}

plant_fifo() {
  mkfifo "$STORE"
}

plant_second_name() {
  cp "$PERSISTENT" "$STORE"
  ln "$STORE" "$STORE.other"
}

plant_half() {
  head -c -40 "$PERSISTENT" >"$STORE"
}

removes_what_is_not_ours() {
  clean
  boot
  install -o "$NOBODY" -m 0644 /dev/null "$STORE"
  try z restore
  [[ $status == 0 && ! -s $STORE ]] && same "$(owner_and_mode "$STORE")" "root:root 644"
}

does_not_follow_a_link_for_the_program() {
  saved
  boot
  echo untouched >"$SCRATCH/victim"
  ln -s "$SCRATCH/victim" "$PROGRAM"
  try z restore
  [[ $status == 0 && ! -L $PROGRAM ]] && same "$(cat "$SCRATCH/victim")" untouched && puts_all_back_as_roots
}

moves_a_directory_away() {
  saved
  boot
  mkdir "$1"
  touch "$1/his"
  try z restore
  [[ $status == 0 && $err == *"what was $1 is now /tmp/zeloscheduler."??????"/${1##*/}"* ]] || { echo "$status $err"; return 1; }
  same "$(names) $(ls /tmp/zeloscheduler.??????/"${1##*/}")" "one two  his" && puts_all_back_as_roots
}

# A directory on which something is mounted cannot be moved.
does_the_rest_beside_a_directory() {
  saved
  boot
  mkdir "$1"
  mount -n -t tmpfs none "$1"
  try z restore
  umount -n "$1"
  says 1 "cannot take $1: Device or resource busy" && same "$(find /tmp -name "zeloscheduler.??????")" ""
}

puts_the_store_back_beside_a_directory() {
  does_the_rest_beside_a_directory "$PROGRAM" && same "$(names)" "one two "
}

leaves_no_scratch_file() {
  same "$(find /tmp /run /usr/zelo/etc -name '*.??????' -not -name 'zeloscheduler.*' -not -name '*.sqlite' | grep -v "^$BUILD_DIR" || true)" ""
}

does_not_wear_the_memory() {
  saved
  z restore >/dev/null
  local before
  before=$(stat -c '%i %Y' "$LAST_GOOD")
  boot
  z restore >/dev/null
  same "$(stat -c '%i %Y' "$LAST_GOOD")" "$before"
}

is_for_root() {
  saved
  boot
  refuses_others "$@" && says 1 "takes root's rights"
}

refuses_others() {
  copy_for_others
  try setpriv --reuid "$NOBODY" --clear-groups "$FOR_OTHERS" "$@"
  says 1 ""
}

leaves_the_old_program_on_a_full_disk() {
  saved
  boot
  echo old >"$PROGRAM"
  leave_room /tmp 8192
  try z restore
  leave_room /tmp
  says 1 "cannot take $PROGRAM" && says 1 "No space left on device" && same "$(cat "$PROGRAM")" old &&
    leaves_no_scratch_file
}

# Bytes, or as much as is usual.
leave_room() {
  local used
  used=$(df --output=used -B1 "$1" | tail -1)
  local size=50%
  if (($# > 1)); then size=$((used + $2)); fi
  mount -n -o "remount,size=$size" "$1"
}

makes_no_half_store_on_a_full_disk() {
  saved
  boot
  fallocate -l 64K /tmp/filler
  leave_room /tmp 0
  try z restore
  leave_room /tmp
  rm /tmp/filler
  says 1 "cannot take $STORE" && [[ ! -s $STORE ]] && leaves_no_scratch_file
}

# Where zelosched is, but the program that it puts back is as the last command makes it.
restore_from_elsewhere() {
  saved
  boot
  rm -rf /run/elsewhere
  mkdir /run/elsewhere
  cp "$BUILD_DIR/bin/zelosched" /run/elsewhere
  "$@"
  try env LD_LIBRARY_PATH="$BUILD_DIR/lib" /run/elsewhere/zelosched restore
}

tells_of_the_program() {
  local why=$1
  shift
  restore_from_elsewhere "$@"
  says 1 "$why" && grep -q "not installed" "$PROGRAM" && same "$(names)" "one two "
}

make_large_program() {
  truncate -s 300M /run/elsewhere/zeloschedtask
}

takes_the_usual_program() {
  mount -n -t tmpfs -o mode=0755 sbin /usr/sbin
  install -m 0700 "$BUILD_DIR/bin/zeloschedtask" /usr/sbin
  restore_from_elsewhere true
  umount -n /usr/sbin
  is_done && puts_all_back_as_roots
}

# A file on which something is mounted can be neither replaced nor removed.
in_the_way() {
  install -o "$NOBODY" -m 0644 /dev/null "$STORE"
  mount -n --bind "$SCRATCH/foreign" "$STORE"
  try z restore
  umount -n "$STORE"
}

tells_what_cannot_be_replaced() {
  saved
  boot
  install -o "$NOBODY" -m 0644 /dev/null "$SCRATCH/foreign"
  in_the_way
  says 1 "cannot take $STORE: Device or resource busy" && [[ -x $PROGRAM ]] && leaves_no_scratch_file
}

tells_what_cannot_be_removed() {
  clean
  boot
  in_the_way
  says 1 "cannot take $STORE: Device or resource busy"
}

puts_back_without_a_last_good_copy() {
  saved
  rm "$LAST_GOOD"
  boot
  mount -n --bind /usr/zelo/etc /usr/zelo/etc
  mount -n -o remount,bind,ro /usr/zelo/etc
  try z restore
  umount -n /usr/zelo/etc
  says 1 "cannot make a file beside $LAST_GOOD: Read-only file system" && same "$(names)" "one two "
}

puts_back_without_a_crontab() {
  saved
  boot
  rm /etc/crontab
  mkdir /etc/crontab
  try z restore
  rmdir /etc/crontab
  [[ $status == 1 && -n $err ]] && same "$(names)" "one two "
}

puts_back_without_knowing_the_boot() {
  saved
  boot
  umount -n "$BOOT_ID"
  mount -n --bind /dev/null "$BOOT_ID"
  try z restore
  umount -n "$BOOT_ID"
  mount -n --bind "$SCRATCH/boot_id" "$BOOT_ID"
  says 1 "$BOOT_ID" && same "$(names)" "one two "
}

puts_back_without_a_history() {
  saved
  rm -r /usr/zelo/var
  touch /usr/zelo/var
  boot
  try z restore
  says 1 "cannot make $KEPT: Not a directory" && same "$(names)" "one two "
}

check "after a boot the tasks are put back" restores_after_a_boot
check "with the program, and both are root's" puts_all_back_as_roots
check "and the crontab is written" synchronises
check "without a task ever saved the names are taken" is_quiet_when_nothing_was_saved
check "a persistent copy that is cut off is made whole from the last good one" \
  is_made_whole "reading or writing failed, or a file is cut off" cut_off
check "so is one without bytes" is_made_whole "is cut off: it has no bytes" cut_to_nothing
check "and one of zeros" is_made_whole "something else" zero
check "and one that ends in zeros" is_made_whole "something else" zero_the_end
check "and one that is something else" is_made_whole "something else" overwrite
check_as_root "another user's is refused for the last good one" falls_back_on_the_last_good "is not root's alone" give_away
check "and one that others can write" falls_back_on_the_last_good "is not root's alone" share
check "and one that is missing" falls_back_on_the_last_good "$PERSISTENT is missing" remove
check "and a directory" falls_back_on_the_last_good "is a directory" make_directory
check "and a FIFO" falls_back_on_the_last_good "is no regular file" make_fifo
check "one with another letter is used, but not kept as good until the tasks are saved" \
  is_used_all_the_same change_a_letter
check "one with a task that cannot be read is refused for the last good one" is_refused_for_the_last_good lose_a_key
check "and one that was written over" is_refused_for_the_last_good write_over_the_middle
check "and one that neither begins nor ends as stores do" is_refused_for_the_last_good lose_the_header_and_the_end
check "without a last good one it is used" is_used_without_a_last_good_copy
check "when neither copy is fit, that is said and nothing made" gives_up_without_a_good_copy
check "and when there is no last good one" gives_up_without_a_last_good_copy
check "tasks that stand in /tmp are kept from an older persistent copy" keeps_what_stands
check "but not by force" replaces_by_force
check "nor by one that is cut off, which is written anew from them" not_even_by_force
check "one that was changed by hand stays" leaves_what_was_changed_by_hand
check_as_root "another user's file in place of the store is replaced" \
  replaces_what_is_not_ours "is not root's alone" plant_file
check "so is one that others can write" replaces_what_is_not_ours "is not root's alone" plant_shared
check "and a link, which is not followed" replaces_what_is_not_ours "is no regular file" plant_link
check "and a FIFO, which is not waited for" replaces_what_is_not_ours "is no regular file" plant_fifo
check "and a file with a second name" replaces_what_is_not_ours "has a second name" plant_second_name
check "and half a store" replaces_what_is_not_ours "cannot be read: reading or writing failed" plant_half
check_as_root "what is not ours goes also when there is nothing to put back" removes_what_is_not_ours
check "a link in place of the program is not followed" does_not_follow_a_link_for_the_program
for name in "$STORE" "$PROGRAM"; do
  check "a directory in place of $name is moved away" moves_a_directory_away "$name"
done
check "one that cannot be moved is told" does_the_rest_beside_a_directory "$STORE"
check "and the store is put back beside it" puts_the_store_back_beside_a_directory
check "no scratch file is left" leaves_no_scratch_file
check "the last good copy is not written again without need" does_not_wear_the_memory
check_as_root "restore is for root" is_for_root restore
check "a program that is missing is told, and the store put back" \
  tells_of_the_program "cannot open /usr/sbin/zeloschedtask: No such file" true
check "so is one without bytes" tells_of_the_program "is cut off" touch /run/elsewhere/zeloschedtask
check "and a FIFO" tells_of_the_program "is no regular file" mkfifo /run/elsewhere/zeloschedtask
check "and one of no likely size" tells_of_the_program "is too large" make_large_program
check "when it is not beside zelosched, it is taken from its usual place" takes_the_usual_program
check_as_root "what stands in the way of the store is told" tells_what_cannot_be_replaced
check_as_root "also when there is nothing to put back" tells_what_cannot_be_removed
check "without a last good copy being kept, the tasks are put back" puts_back_without_a_last_good_copy
check "so they are without a crontab" puts_back_without_a_crontab
check "and without a history" puts_back_without_a_history
check "and without the kernel's name for the boot" puts_back_without_knowing_the_boot
check_as_root "on a full disk no half store is made" makes_no_half_store_on_a_full_disk
check "restore takes no operand" is_refused_as "'now' is more than" restore now
check "and explains its option" explains restore --force
check_as_root "on a full disk the program stays as it was" leaves_the_old_program_on_a_full_disk

# ---- the other names in /tmp ----------------------------------------------------------------

names_in_tmp() {
  find /tmp/lock "$STATUS" "$STATUS"-* -printf '%p %u:%g %m %y\n' 2>/dev/null | sort
}

readonly ALL_TAKEN="/tmp/lock root:root 755 d
/tmp/lock/lock_sched_run root:root 600 f
$STATUS root:root 600 f
$STATUS-journal root:root 600 f"

takes_all_names() {
  "$@"
  boot
  (umask 077 && z restore >/dev/null)
  same "$(names_in_tmp)" "$ALL_TAKEN"
}

# status says why what "$@" has planted is none of ours; the names are taken then.
takes_back() {
  local why=$1
  shift
  boot_with "$@"
  try z status
  [[ $status != 0 && $out == *"warning   "*"$why: 'zelosched restore' makes it root's alone again"* ]] ||
    { echo "$out"; return 1; }
  try z restore
  is_done || return 1
  same "$(names_in_tmp), $(cat "$SCRATCH/victim")" "$ALL_TAKEN, untouched" || return 1
  try z run --wait 1
  is_done
}

passes_over() {
  boot_with true
  z restore >/dev/null
  plant_database "$1"
  try z run --wait 1
  is_done && same "$(stat -c '%U %s' "$STATUS$1")" "nobody 0" || return 1
  try z restore
  [[ $status == 0 && $err == *"$STATUS$1 is not ours: it is taken away"* && ! -e $STATUS$1 ]]
}

as_nobody() {
  setpriv --reuid "$NOBODY" --regid "$NOBODY" --clear-groups "$@"
}

plant_database() {
  as_nobody touch "$STATUS$1"
}

plant_database_link() {
  ln -s "$SCRATCH/victim" "$STATUS"
}

plant_dangling_link() {
  ln -s "$SCRATCH/nothing" "$STATUS"
}

plant_shared_database() {
  install -m 0666 /dev/null "$STATUS"
}

plant_database_directory() {
  mkdir "$STATUS"
}

plant_second_database() {
  install -m 0600 /dev/null "$STATUS"
  ln "$STATUS" "$STATUS.other"
}

plant_lock() {
  as_nobody sh -c 'mkdir /tmp/lock; : >/tmp/lock/lock_sched_run; flock -o /tmp/lock/lock_sched_run sleep 100 >/dev/null 2>&1 &
    until ! flock -n /tmp/lock/lock_sched_run true; do :; done'
}

plant_lock_link() {
  ln -s "$SCRATCH" /tmp/lock
}

plant_lock_file() {
  touch /tmp/lock
}

plant_shared_lock_directory() {
  mkdir -m 0777 /tmp/lock
}

plant_lock_in_ours() {
  mkdir /tmp/lock
  install -o "$NOBODY" -m 0600 /dev/null /tmp/lock/lock_sched_run
}

closes_what_others_can_open() {
  saved
  z restore >/dev/null
  z run --wait 1 >/dev/null
  chmod 0644 "$STATUS" /tmp/lock/lock_sched_run
  try z status
  [[ $out == *"warning   $STATUS can be opened by others"* && $out == *"warning   /tmp/lock/lock_sched_run can be opened by others"* ]] ||
    { echo "$out"; return 1; }
  try z restore
  is_done && same "$(names_in_tmp)" "$ALL_TAKEN" && same "$(z history | wc -l)" 2
}

takes_the_others_beside_one_that_cannot_be_taken() {
  saved
  boot
  mkdir /tmp/lock
  mount -n -t tmpfs -o mode=0777 none /tmp/lock
  try z restore
  umount -n /tmp/lock
  rmdir /tmp/lock
  says 1 "cannot take /tmp/lock" && [[ -e $STATUS && ! -e /tmp/lock ]]
}

tells_of_a_database_that_cannot_be_made() {
  saved
  boot
  echo "this is no database, but long enough to be looked at as one" >"$STATUS"
  chmod 0600 "$STATUS"
  try z restore
  says 1 "cannot make $STATUS" && same "$(names 2>/dev/null)" "one two "
}

check "restore takes the names of the lock and the status database" takes_all_names saved
check "also when no task was ever saved" takes_all_names clean
for suffix in '' -journal; do
  check_as_root "another user's $STATUS$suffix is told and moved away" \
    takes_back "$STATUS$suffix is another user's" plant_database "$suffix"
done
for suffix in -wal -shm; do
  check_as_root "another user's $STATUS$suffix is in nobody's way" passes_over "$suffix"
done
check "so is a link" takes_back "$STATUS is no regular file" plant_database_link
check "and one that leads nowhere" takes_back "$STATUS is no regular file" plant_dangling_link
check "and a database that others can write" takes_back "$STATUS can be written by others" plant_shared_database
check "and a directory" takes_back "$STATUS is no regular file" plant_database_directory
check "and a file with a second name" takes_back "$STATUS has a second name" plant_second_database
check_as_root "and another user's lock that is held" takes_back "/tmp/lock is another user's" plant_lock
check "and a link to a directory" takes_back "/tmp/lock is no directory" plant_lock_link
check "and a file in place of the directory" takes_back "/tmp/lock is no directory" plant_lock_file
check "and a directory that others can write" takes_back "/tmp/lock can be written by others" plant_shared_lock_directory
check_as_root "and another user's file in it" takes_back "/tmp/lock/lock_sched_run is another user's" plant_lock_in_ours
check "what others can open is closed to them, and keeps what it holds" closes_what_others_can_open
check "what cannot be taken does not keep the others from it" takes_the_others_beside_one_that_cannot_be_taken
check "a status database that is none is told" tells_of_a_database_that_cannot_be_made

# ---- what killed writers left ---------------------------------------------------------------

readonly LEFT="/etc/crontab.aB3xY9 /usr/zelo/etc/power_sched.conf.0aZ9bc /usr/zelo/etc/scheduled_tasks.last-good.Qx7pLm"
readonly STAYS="/etc/crontab.backup /etc/crontab.BACKUP /etc/crontab.202611 /etc/crontab.old001 /etc/crontab.aB3xY \
/etc/crontab.aB3xY99 /etc/crontab-aB3xY9 /etc/crontab.aB3-Y9 /etc/acrontab.aB3xY9 /usr/zelo/etc/crontab.aB3xY9"

plants_scratch_names() {
  saved
  as_nobody bash -c 'cd /tmp; mkdir scheduled_tasks.tmp.{1..500}
    touch scheduled_tasks.tmp.7/his; : >scheduled_tasks.tmp.501'
}

# A save has the place of what is under its own name. The others are told, and taken away.
takes_scratch_names_away() {
  plants_scratch_names
  add --daily 04:30 --name three -- true || return 1
  try z status
  [[ $out == *"warning   501 names of scratch copies of the tasks in /tmp belong to other users"* ]] ||
    { echo "$out"; return 1; }
  try z restore
  [[ $status == 0 && $err == *"are now in /tmp/zeloscheduler."* ]] || { echo "$status $err"; return 1; }
  same "$(find /tmp -maxdepth 1 -name 'scheduled_tasks.tmp.*' | wc -l)" 0
}

removes_what_killed_writers_left() {
  clean
  # shellcheck disable=SC2086
  touch -d '2 minutes ago' $LEFT $STAYS
  touch /etc/crontab.cD4zY8
  try z restore
  local name bad=0
  for name in $LEFT; do
    [[ ! -e $name && $out == *"$name was left by a program that was ended: it is removed"* ]] || { echo "$name"; bad=1; }
  done
  for name in $STAYS /etc/crontab.cD4zY8; do [[ -e $name ]] || { echo "$name"; bad=1; }; done
  # shellcheck disable=SC2086
  rm -f $STAYS /etc/crontab.cD4zY8
  return "$bad"
}

leaves_other_things_of_such_a_name() {
  ln -s "$SCRATCH/nothing" /etc/crontab.aB3xY1
  mkdir /etc/crontab.aB3xY2
  touch /etc/crontab.aB3xY3
  chown "$NOBODY" /etc/crontab.aB3xY3
  touch -h -d '2 minutes ago' /etc/crontab.aB3xY?
  z restore >/dev/null
  local count
  count=$(find /etc -name 'crontab.aB3xY?' | wc -l)
  rm -rf /etc/crontab.aB3xY?
  same "$count" 3
}

tells_what_cannot_be_taken_away() {
  touch -d '2 minutes ago' /usr/zelo/etc/power_sched.conf.0aZ9bc
  mount -n --bind /usr/zelo/etc /usr/zelo/etc
  mount -n -o remount,bind,ro /usr/zelo/etc
  try z restore
  umount -n /usr/zelo/etc
  rm /usr/zelo/etc/power_sched.conf.0aZ9bc
  says 1 "cannot remove /usr/zelo/etc/power_sched.conf.0aZ9bc: Read-only file system"
}

check_as_root "names of scratch copies that others have taken are told and taken away" takes_scratch_names_away
check "what killed writers left is removed" removes_what_killed_writers_left
check_as_root "but no link, no directory, and nothing of another user's" leaves_other_things_of_such_a_name
check "what cannot be removed is told" tells_what_cannot_be_taken_away

# ---- history that outlives a boot -----------------------------------------------------------

# run ID START STATUS [COMMENT [STATUS_ID [PID]]]: as the library records it
run() {
  if [[ ! -s $STATUS ]]; then
    install -m 0600 /dev/null "$STATUS"
    sql "$STATUS" "CREATE TABLE if not exists task_status(status_id INTEGER PRIMARY KEY ASC, pid INTEGER, timestamp INTEGER, app STRING, task_id INTEGER, status_code INTEGER, comment STRING);"
  fi
  sql "$STATUS" "INSERT INTO task_status VALUES(${5:-NULL}, ${6:-4194305},
    $(date -u -d "$2" +%s), 'app', $1, $3, '${4:-}')"
}

history_is() {
  same "$(z history --json | python3 -c 'import json, sys
for run in json.load(sys.stdin)["runs"]:
    words = [run["outcome"] or run["state"], run["exit_code"] or run["signal"] or ""]
    print(run["task"], run["start"][:19].replace("T", " "), " ".join(map(str, words)).strip(), sep=", ")')" "$1"
}

readonly NOW="2026-11-20 12:00"

keep() {
  try at "$NOW" history --keep
}

keeps_runs_over_a_boot() {
  clean
  run 1 "2026-11-20 08:00" 3
  run 2 "2026-11-20 09:00" 7 5
  keep
  is_done && same "$out" "2 runs kept" || return 1
  boot
  history_is "2, 2026-11-20 09:00:00, failed 5
1, 2026-11-20 08:00:00, finished"
}

shows_both() {
  run 1 "2026-11-20 10:00" 6 9
  history_is "1, 2026-11-20 10:00:00, killed 9
2, 2026-11-20 09:00:00, failed 5
1, 2026-11-20 08:00:00, finished"
}

limits_and_filters_both() {
  same "$(z history 1 --limit 1 | wc -l), $(z history 1 | wc -l), $(z history --limit 2 | wc -l)" "2, 3, 3"
}

keeps_each_run_once() {
  keep
  same "$out" "" || return 1
  keep
  is_done && same "$out" "" && same "$(sql "$KEPT" 'SELECT count(*) FROM run')" 3
}

# Number 1 again, which another run had before the boot.
tells_runs_with_one_id_apart() {
  same "$(sql "$KEPT" 'SELECT count(*) FROM run WHERE status_id = 1')" 2
}

takes_a_changed_result() {
  clean
  run 1 "2026-11-20 08:00" 2 "" 1 $$
  keep
  sql "$STATUS" "UPDATE task_status SET status_code = 7, comment = 3"
  keep
  same "$out" "1 run kept" || return 1
  boot
  history_is "1, 2026-11-20 08:00:00, failed 3"
}

knows_what_ran_at_the_shutdown() {
  clean
  run 1 "2026-11-20 08:00" 2 "" 1 $$
  keep
  boot
  history_is "1, 2026-11-20 08:00:00, lost"
}

knows_what_ran_before_a_boot_that_left_tmp() {
  clean
  run 1 "2026-11-20 08:00" 2 "" 1 $$
  keep
  history_is "1, 2026-11-20 08:00:00, running" || return 1
  cat /proc/sys/kernel/random/uuid >"$SCRATCH/boot_id"
  keep
  history_is "1, 2026-11-20 08:00:00, lost"
}

is_roots_alone() {
  same "$(owner_and_mode "$KEPT"), $(owner_and_mode /usr/zelo/var)" "root:root 600, root:root 755"
}

keeps_what_is_old() {
  clean
  run 1 "2020-11-01 08:00" 3
  run 1 "2026-11-01 08:00" 3
  keep
  same "$(sql "$KEPT" 'SELECT count(*) FROM run'), $out" "2, 2 runs kept"
}

# As after a boot with a clock that has lost its battery.
keeps_all_by_a_clock_that_is_wrong() {
  boot
  run 1 "2099-01-01 08:00" 3
  try at "2099-01-01 12:00" history --keep
  is_done && same "$(sql "$KEPT" 'SELECT count(*) FROM run')" 3
}

keeps_behind_a_link() {
  clean
  run 1 "2026-11-20 08:00" 3
  rm -rf "$SCRATCH/volume"
  mkdir "$SCRATCH/volume"
  ln -s "$SCRATCH/volume" /usr/zelo/var
  keep
  is_done && boot && history_is "1, 2026-11-20 08:00:00, finished" && [[ -s $SCRATCH/volume/history.sqlite ]]
}

# Many are of one second, as when the clock stood.
drops_what_is_too_much() {
  clean
  keep
  sql "$KEPT" "WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n WHERE i < 100010)
    INSERT INTO run(task, task_name, app, owner, started_by, start, state, outcome, output_bytes,
      moment, boot, status_id, pid, told)
    SELECT i % 1000, '', '', '', 3, 1790000000 + max(i, 30), 2, 1, 0, 1790000000 + max(i, 30), '', i, 1, 1 FROM n"
  keep
  is_done && same "$(sql "$KEPT" 'SELECT count(*), min(status_id), max(status_id) FROM run')" \
    "100000 11 100010"
}

refuses_to_keep_in() {
  local why=$1
  shift
  clean
  run 1 "2026-11-20 08:00" 3
  mkdir -p /usr/zelo/var
  "$@"
  keep
  says 1 "$KEPT: $why" || return 1
  try z history
  says 1 "$KEPT: $why" || return 1
  try at "$NOW" status
  [[ $status == [14] && $out == *"warning   cannot "*"$KEPT: $why"* ]] || { echo "$out"; return 1; }
}

no_database() {
  install -m 0600 /dev/null "$KEPT"
  head -c 9000 /dev/zero | tr '\0' x >"$KEPT"
}

given_away_database() {
  install -m 0600 -o "$NOBODY" /dev/null "$KEPT"
}

shared_directory() {
  keep
  chmod 0777 /usr/zelo/var
}

later_database() {
  keep
  sql "$KEPT" "PRAGMA user_version = 3"
}

shared_database() {
  install -m 0666 /dev/null "$KEPT"
}

linked_database() {
  ln -s "$SCRATCH/elsewhere" "$KEPT"
  : >"$SCRATCH/elsewhere"
}

says_that_no_directory_can_be_made() {
  clean
  touch /usr/zelo/var
  keep
  says 1 "cannot make $KEPT: Not a directory"
}

shows_nothing_of_it_to_others() {
  clean
  run 1 "2026-11-20 08:00" 3
  keep
  boot
  refuses_others history && says 1 "takes root's rights"
}

keeps_none_for_others() {
  clean
  refuses_others history --keep && says 1 "cannot make /usr/zelo/var: Permission denied"
}

knows_that_it_is_up_beside_a_refused_status_database() {
  clean
  mkdir "$STATUS"
  mount -n -t tmpfs none "$STATUS"
  keep
  umount -n "$STATUS"
  says 1 "cannot read $STATUS" && same "$(sql "$KEPT" 'SELECT seen FROM up')" "$(date -u -d "$NOW" +%s)"
}

keeps_what_is_kept_on_a_full_disk() {
  clean
  mkdir /usr/zelo/var
  mount -n -t tmpfs -o mode=0755,size=256k var /usr/zelo/var
  run 1 "2026-11-20 08:00" 3
  keep
  boot
  head -c 1m /dev/zero >/usr/zelo/var/full 2>/dev/null || true
  run 2 "2026-11-20 09:00" 6 9
  keep
  rm "$STATUS"
  local kept
  kept=$(z history --json 2>/dev/null | grep -c finished)
  umount -n /usr/zelo/var
  says 1 "database or disk is full" && same "$kept" 1
}

gives_up_on_a_held_history() {
  clean
  run 1 "2026-11-20 08:00" 3
  keep
  run 2 "2026-11-20 08:00" 3
  python3 - "$KEPT" "$ZELOSCHED" "$FAKE" >"$SCRATCH/out" 2>"$SCRATCH/err" <<'HOLD' && status=0 || status=$?
import os, sqlite3, subprocess, sys
held = sqlite3.connect(sys.argv[1], isolation_level=None)
held.execute("BEGIN EXCLUSIVE")
sys.exit(subprocess.run([sys.argv[2], "history", "--keep"], timeout=60,
    env=dict(os.environ, LD_PRELOAD=sys.argv[3], FAKE_PATIENCE="1")).returncode)
HOLD
  err=$(cat "$SCRATCH/err") out=$(cat "$SCRATCH/out")
  says 1 "$KEPT: database is locked"
}

reads_what_cannot_be_written() {
  clean
  run 1 "2026-11-20 08:00" 3
  keep
  boot
  mount -n --bind /usr/zelo/var /usr/zelo/var
  mount -n -o remount,bind,ro /usr/zelo/var
  history_is "1, 2026-11-20 08:00:00, finished" && keep
  umount -n /usr/zelo/var
  says 1 "cannot "
}

looks_without_making() {
  clean
  z history >/dev/null
  z status >/dev/null || true
  [[ ! -e /usr/zelo/var ]]
}

check "runs are kept over a boot" keeps_runs_over_a_boot
check "and shown with those after it" shows_both
check "by task and number" limits_and_filters_both
check "a run is kept once" keeps_each_run_once
check "numbers that come again after a boot are told apart" tells_runs_with_one_id_apart
check "a result that changed is taken over" takes_a_changed_result
check "what ran when the machine went off is known to be gone" knows_what_ran_at_the_shutdown
check "also where /tmp outlived the boot and another process has its number" \
  knows_what_ran_before_a_boot_that_left_tmp
check "the kept history is root's alone" is_roots_alone
check "runs are kept however old they are" keeps_what_is_old
check "also by a clock that is wrong" keeps_all_by_a_clock_that_is_wrong
check "of more than a hundred thousand the oldest are dropped" drops_what_is_too_much
check "the directory may be a link to a data volume" keeps_behind_a_link
check "a file that is no database is refused" refuses_to_keep_in "file is not a database" no_database
check "so is that of a later version" refuses_to_keep_in "a later zelosched made it" later_database
check "and one that others can write" refuses_to_keep_in "it is not this user's own file alone" shared_database
check_as_root "and another user's" refuses_to_keep_in "it is not this user's own file alone" given_away_database
check "and one where others can put files beside it" \
  refuses_to_keep_in "its directory is not this user's alone" shared_directory
check "and a link" refuses_to_keep_in "it is not this user's own file alone" linked_database
check "a directory that cannot be made is told" says_that_no_directory_can_be_made
check_as_root "the kept history is not shown to others" shows_nothing_of_it_to_others
check_as_root "nor made by them" keeps_none_for_others
check "beside a status database that is refused, that the machine is up is noted" \
  knows_that_it_is_up_beside_a_refused_status_database
check "on a full disk what is kept stays" keeps_what_is_kept_on_a_full_disk
check "a history that another holds for too long is told" gives_up_on_a_held_history
check "one that cannot be written is shown" reads_what_cannot_be_written
check "keeping stands alone" is_refused_as "'--keep' stands alone" history --keep --json
check "and takes no id" is_refused_as "'3' is more than" history --keep 3
check "and is explained" explains history --keep
check "a look at the history makes no file" looks_without_making

# ---- what was missed ------------------------------------------------------------------------

# Off from one to eight o'clock on a Friday.
readonly OFF="2026-11-20 01:00:20" ON="2026-11-20 08:00:40" LATER="2026-11-20 08:05"

went_off() {
  clean
  "$@"
  at "$OFF" history --keep
  boot
  at "$ON" restore >/dev/null
}

missed() {
  at "$LATER" catch-up --dry-run "$@" | sed -n 's/^task [0-9]* (\(.*\)) was due at \(.*\): would.*/\1 \2/p'
}

tasks_of_all_kinds() {
  add --daily 02:30 --name daily -- "echo daily >>$SCRATCH/ran"
  add --daily 00:15 --every 1h --until 23 --name hourly -- "echo hourly >>$SCRATCH/ran"
  add --once 2026-11-20T03:00 --name once -- "echo once >>$SCRATCH/ran" 2>/dev/null ||
    at "$OFF" add --quiet --once 2026-11-20T03:00 --name once -- "echo once >>$SCRATCH/ran" >/dev/null
  add --weekly fri 08:00 --name weekly -- "echo weekly >>$SCRATCH/ran"
  add --daily 01:00 --name before -- true
  add --daily 08:01 --name after -- true
  add --weekly sat 04:00 --name saturday -- true
  add --daily 05:00 --disabled --name disabled -- true
  z power add on --daily 05:00 >/dev/null 2>&1 || true
}

finds_what_was_missed() {
  went_off tasks_of_all_kinds
  same "$(missed)" "daily 2026-11-20 02:30
once 2026-11-20 03:00
hourly 2026-11-20 07:15
weekly 2026-11-20 08:00"
}

finds_what_was_missed_within() {
  same "$(missed --within 90m)" "hourly 2026-11-20 07:15
weekly 2026-11-20 08:00"
}

status_names_them() {
  try at "$LATER" status
  [[ $status == [14] && $out == *"warning   task 1 (daily) was due at 2026-11-20 02:30, when the machine\
 was off: 'zelosched run 1' runs it now"* ]] || { echo "$out"; return 1; }
  same "$(grep -c 'when the machine was off' <<<"$out")" 4
}

lists_without_running() {
  [[ ! -e $SCRATCH/ran ]] && same "$(sql "$KEPT" 'SELECT count(*) FROM missed')" 4
}

all_ran() {
  local tenths
  for ((tenths = 0; tenths < 200; tenths++)); do
    [[ $(sort "$SCRATCH/ran" 2>/dev/null | tr '\n' ' ') == "daily hourly once weekly " ]] && return
    sleep 0.1
  done
  cat "$SCRATCH/ran"
  return 1
}

runs_each_once() {
  try at "$LATER" catch-up
  is_done && same "$out" "task 1 (daily) was due at 2026-11-20 02:30: started
task 3 (once) was due at 2026-11-20 03:00: started
task 2 (hourly) was due at 2026-11-20 07:15: started
task 4 (weekly) was due at 2026-11-20 08:00: started" && all_ran
}

finds_none_afterwards() {
  try at "$LATER" catch-up
  is_done && same "$out" "no run was missed within 12h" && all_ran &&
    ! at "$LATER" status | grep 'when the machine was off'
}

# As while a run waits for its turn.
finds_none_before_it_is_recorded() {
  rm "$STATUS"
  same "$(missed)" ""
}

one_task() {
  add --daily 02:30 --name one -- true
}

# "$@" takes the one task out of what was missed.
is_not_missed_any_more() {
  went_off one_task
  same "$(missed)" "one 2026-11-20 02:30" || return 1
  "$@" >/dev/null
  same "$(missed)" ""
}

removed_and_another_added() {
  z remove 1 --yes
  add --daily 02:30 --app other --name other -- true
}

remembers_over_another_boot() {
  went_off one_task
  boot
  at "2026-11-20 08:02" restore >/dev/null
  same "$(missed)" "one 2026-11-20 02:30"
}

restored_by_hand_misses_nothing() {
  clean
  one_task
  at "$OFF" restore >/dev/null
  at "$ON" restore >/dev/null
  same "$(missed)" ""
}

a_task_of_later_missed_nothing() {
  went_off true
  one_task
  same "$(missed)" ""
}

misses_nothing_without_an_earlier_boot() {
  clean
  one_task
  boot
  at "$ON" restore >/dev/null
  same "$(missed)" ""
}

misses_nothing_in_the_future() {
  clean
  one_task
  at "$OFF" history --keep
  boot
  at "2099-01-01 08:00" restore >/dev/null
  same "$(at "2099-01-01 08:05" catch-up --dry-run | grep -c "due at 2099-01-01 02:30")" 1 || return 1
  same "$(missed --within 7d)" "" && ! at "$LATER" status | grep 'when the machine was off' || return 1
  at "$LATER" history --keep
  same "$(sql "$KEPT" 'SELECT count(*) FROM missed')" 0
}

# Nor does it take away what was missed before.
misses_all_behind_a_clock_that_is_wrong_for_once() {
  went_off one_task
  z disable 1 >/dev/null
  boot
  at "2099-01-01 08:00" restore >/dev/null
  z enable 1 >/dev/null
  same "$(missed)" "one 2026-11-20 02:30"
}

misses_nothing_by_a_clock_set_back() {
  clean
  one_task
  at "$ON" history --keep
  boot
  at "$OFF" restore >/dev/null
  same "$(missed)" ""
}

forgets_after_a_week() {
  went_off one_task
  same "$(at "2026-11-27 02:31" catch-up --dry-run --within 7d)" "no run was missed within 7d"
}

misses_what_passed_until_the_tasks_were_back() {
  clean
  one_task
  at "$OFF" history --keep
  truncate -s -40 "$PERSISTENT"
  rm "$LAST_GOOD"
  boot
  at "2026-11-20 02:00" restore >/dev/null 2>&1 && return 1
  at "2026-11-20 02:10" history --keep
  same "$(sql "$KEPT" "SELECT seen FROM up")" "$(date -u -d "$OFF" +%s)" || return 1
  rm "$PERSISTENT"
  one_task
  at "$ON" history --keep
  same "$(missed)" "one 2026-11-20 02:30"
}

tells_what_cannot_be_started() {
  went_off one_task
  FAKE_TIME=$(date -u -d "$LATER" +%s) LD_PRELOAD="$FAKE $NO_FORK" try "$ZELOSCHED" catch-up
  says 1 "cannot run task 1 (one)" && same "$(missed)" "one 2026-11-20 02:30"
}

one_long_task() {
  add --daily 02:30 --name one -- "echo \$\$ >$SCRATCH/long; exec sleep 100"
}

keeps_missed_what_cannot_be_recorded() {
  went_off one_task
  rm "$STATUS"*
  mkdir "$STATUS"
  mount -n -t tmpfs none "$STATUS"
  try at "$LATER" catch-up
  umount -n "$STATUS"
  says 1 "cannot record a run in $STATUS" && same "$(missed)" "one 2026-11-20 02:30"
}

has_its_turn_whatever_is_in_the_way() {
  went_off one_task
  rm -rf /tmp/lock
  : >/tmp/lock
  try at "$LATER" catch-up
  is_done && [[ -d /tmp/lock ]]
}

holds_nobody_up() {
  rm -f "$SCRATCH/long"
  went_off one_long_task
  try at "$LATER" catch-up
  is_done || return 1
  until [[ -s $SCRATCH/long ]]; do sleep 0.05; done
  flock -n /run/zelosched.lock kill "$(cat "$SCRATCH/long")"
}

two_at_once_run_each_once() {
  rm -f "$SCRATCH/ran"
  went_off tasks_of_all_kinds
  at "$LATER" catch-up >/dev/null &
  at "$LATER" catch-up >/dev/null
  wait "$!"
  all_ran
}

check "what was due while the machine was off is found" finds_what_was_missed
check "within the time that is asked for" finds_what_was_missed_within
check "status names it" status_names_them
check "nothing is run by that" lists_without_running
check "catch-up runs each once" runs_each_once
check "and finds none afterwards" finds_none_afterwards
check "also before the runs are recorded" finds_none_before_it_is_recorded
check "two at once run each once" two_at_once_run_each_once
check "a task that ran since is not missed" is_not_missed_any_more at "$LATER" run 1 --wait
check "nor one that is disabled" is_not_missed_any_more z disable 1
check "nor one that is removed" is_not_missed_any_more z remove 1 --yes
check "nor one of its id" is_not_missed_any_more removed_and_another_added
check "nor one whose time is another by now" is_not_missed_any_more z edit 1 --daily 09:00
check "a missed task is remembered over another boot" remembers_over_another_boot
check "a restore by hand finds nothing missed" restored_by_hand_misses_nothing
check "a task that was added later has missed nothing" a_task_of_later_missed_nothing
check "without an earlier boot nothing was missed" misses_nothing_without_an_earlier_boot
check "nor by a clock that was set back" misses_nothing_by_a_clock_set_back
check "nor in the future, by a clock that was wrong" misses_nothing_in_the_future
check "which takes nothing away" misses_all_behind_a_clock_that_is_wrong_for_once
check "after a week it is told no more" forgets_after_a_week
check "what passed before the tasks were back is missed too" misses_what_passed_until_the_tasks_were_back
check "a run that cannot be started is told, and remains missed" tells_what_cannot_be_started
check "and so does one that cannot be recorded" keeps_missed_what_cannot_be_recorded
check "what is in the way of its turn is moved away" has_its_turn_whatever_is_in_the_way
check "a run that goes on keeps nobody from changing tasks" holds_nobody_up
check_as_root "catch-up is for root" is_for_root catch-up
for span in 8d 169h 0m -1h 12 h 1.5h ''; do
  check "a time of '$span' is refused" is_refused_as "takes a time from 1m to 7d" catch-up --within "$span"
done
check "catch-up takes no operand" is_refused_as "'1' is more than" catch-up 1
check "and explains its options" explains catch-up "--within TIME" --dry-run
finish
