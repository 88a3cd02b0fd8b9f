#!/bin/bash
# The power fails right after a change was acknowledged, or when /bin/cp has emptied its target. What
# was acknowledged is there after the boot: the file system of the persistent copy is in an image,
# which is copied at that moment, so that the copy has only what had been written to the disk.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"
# shellcheck source=tests/support/zelosched_test.sh
. "$here/support/zelosched_test.sh"

readonly DISK=/usr/zelo/etc
readonly CUT=$SCRATCH/cut.img
# The journal is not committed during the test, unless something is synced.
readonly OPTIONS=commit=300
mkdir -p "$DISK"

has_disk() {
  truncate -s 16M "$SCRATCH/disk.img" && mke2fs -q -t ext4 "$SCRATCH/disk.img" &&
    mount -o "loop,$OPTIONS" "$SCRATCH/disk.img" "$DISK"
}

add_task() {
  add --daily 02:30 --name "$1" -- true
}

# Restores the tasks from what was on the disk, as a boot does, and prints their names.
tasks_after_boot() {
  mkdir -p "$SCRATCH/now"
  mount --move "$DISK" "$SCRATCH/now" 2>/dev/null || mount --bind "$DISK" "$SCRATCH/now"
  mount -o "loop,$OPTIONS" "$CUT" "$DISK"
  rm -rf /tmp/scheduled_tasks
  z restore >/dev/null 2>"$SCRATCH/said" || cat "$SCRATCH/said"
  names
  umount "$DISK"
  mount --move "$SCRATCH/now" "$DISK" 2>/dev/null || umount "$SCRATCH/now"
  rm -rf /tmp/scheduled_tasks
  z restore >/dev/null
}

keeps_three_tasks() {
  add_task one && add_task two && add_task three || return 1
  cp "$SCRATCH/disk.img" "$CUT"
  same "$(tasks_after_boot)" "one three two"
}

# Replaces /bin/cp: the power fails when it has emptied its target, and the empty target is on the
# disk.
cut_in_copies_of() {
  cat >"$SCRATCH/cp" <<CP
#!/bin/sh
if [ "\$3" = "$1" ]; then
  : >"\$3"
  sync "\$3"
  $SCRATCH/real_cp "$SCRATCH/disk.img" "$CUT"
fi
exec $SCRATCH/real_cp "\$@"
CP
  chmod 755 "$SCRATCH/cp"
  cp /bin/cp "$SCRATCH/real_cp"
  mount -n --bind "$SCRATCH/cp" /bin/cp
}

# is_whole_when_cut TARGET TASKS COMMAND...
is_whole_when_cut() {
  local target=$1 wanted=$2
  shift 2
  rm -f "$CUT"
  cut_in_copies_of "$target"
  local status=0
  "$@" || status=$?
  umount -n /bin/cp
  [[ $status == 0 && -e $CUT ]] && same "$(tasks_after_boot)" "$wanted"
}

if ((EUID != 0)) || ! has_disk 2>"$SCRATCH/why"; then
  skip "what is acknowledged outlives the loss of power" "no image can be mounted here: $(cat "$SCRATCH/why")"
  finish
fi
check "three acknowledged tasks outlive the loss of power right after" keeps_three_tasks
check "so they do while the persistent copy is emptied for a fourth" \
  is_whole_when_cut "$DISK/scheduled_tasks" "four one three two" add_task four
check "and while it is emptied for a removal" \
  is_whole_when_cut "$DISK/scheduled_tasks" "four three two" z remove 1 --yes
check "a task is on the disk before the working copy is written" \
  is_whole_when_cut /tmp/scheduled_tasks "five four three two" add_task five
umount "$DISK"
finish
