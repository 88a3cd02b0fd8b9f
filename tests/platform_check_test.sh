#!/bin/bash
# examples/platform_check.c: it finds no fault in our platform, and reports each contract that another
# breaks. Power times, crontab, alarm and plugins are left as they were, whatever the platform does.
#
# Functions are called by check, and what is in single quotes is for another shell:
# shellcheck disable=SC2016,SC2089,SC2090,SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"

export CHECK=$BUILD_DIR/tests/platform_check
export WRONG=$BUILD_DIR/tests/wrong_platform.so
export PLUGINS=/usr/zelo/libexec/plugins/platform_check.d
readonly WORK=$BUILD_DIR/platform_check_test
readonly AT_ONCE=8 # most wait for a second
sandbox=$(cd "$here/.." && pwd -P)/scripts/sandbox
mkdir -p "$WORK"

# No test may arm the machine's own clock. `state` shows all that the check could change.
readonly MACHINE='mount -n -t tmpfs sys /sys && mkdir -p /sys/class/rtc/rtc0 && : >/sys/class/rtc/rtc0/wakealarm
  state() { cksum /etc/crontab; stat -c %a:%u:%g /etc/crontab; grep -s times /usr/zelo/etc/power_sched.conf
    ls -R /usr/zelo /tmp; tr -d "0\n" </sys/class/rtc/rtc0/wakealarm; }
  times() { printf "[poweron]\ntimes=\"%s\"\n[poweroff]\ntimes=\"%s\"\n" "$@" >/usr/zelo/etc/power_sched.conf; }
  wrongly() { WRONG_PLATFORM=$1 LD_PRELOAD=$WRONG "$CHECK" "${@:2}"; }'
export MACHINE

# on_machine COMMANDS [ARGUMENTS]
on_machine() {
  "$sandbox" bash -c "$MACHINE"$'\n'"$1" bash "${@:2}"
}

finds_no_fault() {
  on_machine '"$CHECK" "$@"' "$@" >"$WORK/own" 2>"$WORK/sum" && ! grep -v '^ok ' "$WORK/own" &&
    same "$(cat "$WORK/sum")" "$(grep -c '^ok ' "$WORK/own") hold, 0 do not"
}

# Prints the broken contracts that the check does not report.
unnamed_faults() {
  export -f on_machine
  export sandbox
  sed 's/^ok //' "$WORK/own" | tr '\n' '\0' | xargs -0 -P "$AT_ONCE" -I FAULT bash -c '
    on_machine "wrongly \"\$1\" --system \"\$PLUGINS\"" "$1" 2>&1 | grep -qF "not ok $1" || echo "$1"' bash FAULT
}

# left_alone FAULT ARGUMENTS: whether the check changes nothing, on a machine with power times of others
left_alone() {
  same "$(on_machine 'times "0 127 7 30" "1 62 23 0"; before=$(state)
    wrongly "$@" >/dev/null 2>&1; diff <(echo "$before") <(state) && echo same' "$@")" same
}

# Without --system even a wrong platform is not led to change the machine.
nothing_is_done() {
  local fault
  for fault in none "ZELOAutoPowerConfSet: a list that does not exist is refused" \
    "ZELOAutoPowerConfSet: an hour of 24 is refused" "ZELOScheduleSet: an hour of 24 is refused" \
    "ZELOScheduleSet: no line without a weekday"; do
    left_alone "$fault" || { echo "$fault"; return 1; }
  done
}

everything_is_put_back() {
  local fault
  for fault in none "ZELOAutoPowerConfSet crashes" "ZELOScheduleSet crashes" "QLIBPluginAction crashes" \
    "ZELOAutoPowerConfSet: a list that does not exist is refused" "ZELOScheduleSet: an hour of 24 is refused" \
    "ZELOScheduleSet: every other line stays, and one is new" "ZELOScheduleSet: owner and mode stay"; do
    left_alone "$fault" --system "$PLUGINS" || { echo "$fault"; return 1; }
  done
}

# The signal goes to the whole process group, as one from a terminal does.
puts_back_when_interrupted() {
  same "$(on_machine 'before=$(cksum /etc/crontab)
    WRONG_PLATFORM="ZELOScheduleSet hangs" LD_PRELOAD=$WRONG timeout -s INT 3 "$CHECK" --system | grep -v "^ok "
    test "$before" = "$(cksum /etc/crontab)" && echo same')" \
    $'not ok ZELOScheduleSet: a line of the time that runs the command as root (ended by signal 2)\nsame'
}

puts_back_a_long_crontab() {
  same "$(on_machine 'seq -f "# %g is a line of a crontab" 5000 >>/etc/crontab; before=$(cksum /etc/crontab)
    wrongly "ZELOScheduleSet: every other line stays, and one is new" --system >/dev/null
    test "$before" = "$(cksum /etc/crontab)" && echo same')" same
}

makes_no_crontab() {
  same "$(on_machine 'rm /etc/crontab; "$CHECK" --system | grep -v "^ok "; ls /etc/crontab 2>/dev/null')" \
    "not ok /etc/crontab: cannot be read, so no line was added"
}

keeps_lists_that_cannot_be_read() {
  same "$(on_machine 'times "what nobody reads" ""; before=$(state)
    "$CHECK" --system | grep -v "^ok "; test "$before" = "$(state)" && echo same')" \
    $'not ok ZELOAutoPowerConfGet: the lists are read\nsame'
}

keeps_directories_of_plugins() {
  same "$(on_machine 'mkdir -p "${PLUGINS%/*}"; "$CHECK" --system "$PLUGINS" >/dev/null; find /usr/zelo/libexec')" \
    $'/usr/zelo/libexec\n/usr/zelo/libexec/plugins'
}

takes_no_plugin_away() {
  same "$(on_machine 'mkdir -p "$PLUGINS"; echo one >"$PLUGINS/platform_check"
    "$CHECK" --system "$PLUGINS" | grep -v "^ok "; cat "$PLUGINS/platform_check"')" \
    "not ok $PLUGINS/platform_check: is there already, so no plugin was called"$'\none'
}

names_a_call_that_exits() {
  same "$(on_machine 'wrongly "QLIBCSzListCount exits" | grep -v "^ok "; echo "${PIPESTATUS[0]}"' |
    grep -v 'QLIBCFile\|hashes\|SzHash')" \
    $'not ok QLIBCSzListAlloc: an empty list, whatever the capacity (ended with status 0)\n1'
}

sums_up() {
  same "$(on_machine 'wrongly "QLIBCExec: the exit status" >/tmp/out 2>&1
    test "$(tail -n 1 /tmp/out)" = "$(grep -c "^ok " /tmp/out) hold, $(grep -c "^not ok " /tmp/out) do not" && echo same')" same
}

# A platform may add the line elsewhere in the file than ours does.
takes_a_line_anywhere() {
  same "$(on_machine 'wrongly "ZELOScheduleSet adds lines in front" --system | grep -cv "^ok "')" 0
}

takes_a_user_with_the_highest_id() {
  same "$(on_machine 'echo "last:x:4294967294:65534::/:/bin/sh" >>/etc/passwd; "$CHECK" | grep "4294967294\|highest"')" \
    "ok ZELOUserGetByUID: the highest id is looked up like any other"
}

# Another user with CAP_DAC_READ_SEARCH, as the programs may lie where only root can read.
refuses_who_is_not_root() {
  same "$(on_machine 'before=$(state)
    setpriv --reuid 65534 --regid 65534 --clear-groups --inh-caps +dac_read_search --ambient-caps +dac_read_search \
      "$CHECK" --system 2>&1; echo "$?"
    diff <(echo "$before") <(state) && echo same')" \
    "$CHECK: only root can check what a machine has once"$'\n2\nsame'
}

wrong_call_is_refused() {
  local status=0
  "$CHECK" "$@" >/dev/null 2>&1 || status=$?
  same "$status" 2
}

check "our platform keeps every contract that needs no system of its own" finds_no_fault
check "and all others" finds_no_fault --system "$PLUGINS"
check "there are many of them" test "$(wc -l <"$WORK/own")" -ge 175
check "every fault is named" same "$(unnamed_faults)" ""
check "a call that exits is named" names_a_call_that_exits
check "without being asked for, nothing of a machine is changed, whatever the platform does" nothing_is_done
check "what a machine has once is put back, also after a crash" everything_is_put_back
check "and after an interrupt" puts_back_when_interrupted
check "so is a long crontab" puts_back_a_long_crontab
check "where there is no crontab, none is made" makes_no_crontab
check "power times that cannot be read stay" keeps_lists_that_cannot_be_read
check "directories of plugins that were there stay" keeps_directories_of_plugins
check "so does a plugin" takes_no_plugin_away
check "the last line is the sum" sums_up
check "a line of the crontab may be anywhere" takes_a_line_anywhere
check "a user may have the highest id" takes_a_user_with_the_highest_id
check "what a machine has once is left to root" refuses_who_is_not_root
check "a wrong call is refused" wrong_call_is_refused --sistem
check "so is a directory without its path" wrong_call_is_refused --system plugins
finish
