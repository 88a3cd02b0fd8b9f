#!/bin/bash
# The Debian packages: built, installed into a small root of their own, used there, in a boot of
# systemd too, and removed without a trace outside the data.
#
# Functions are called by check, and commands in single quotes are for the shell in the root:
# shellcheck disable=SC2016,SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"

checkout=$(cd "$here/.." && pwd -P)
# shellcheck source=tests/support/web_package.sh
. "$here/support/web_package.sh"

readonly PACKAGES=(libzelocore libzelosdk libzeloscheduler4 libzeloscheduler-dev zeloscheduler-tools)
readonly WORK=$BUILD_DIR/package_test
readonly ROOT=$WORK/root
readonly DEBS=$WORK/packages
# It is made once, and again when it is a week old: packages leave the mirror as their fixes come.
readonly ROOT_TAR=$WORK/root.tar
readonly DAYS_FRESH=7
readonly INSIDE_PATH=/usr/sbin:/usr/bin:/sbin:/bin
readonly BOOT_PATIENCE=60 # seconds
readonly OUR_TRACES='zelo|sched_status|scheduled_tasks|power_sched'
export LC_ALL=C JOBS=${JOBS:-1}

if ((EUID != 0)) || ! grep -q '^ *0 *0 ' /proc/self/uid_map; then
  skip "packages are built, installed, used and removed" "only root can make a root to install into"
  finish
fi
umask 022
mkdir -p "$WORK"

# ---- a root to install into -------------------------------------------------------------------

make_root_tar() {
  if [[ -n $(find "$ROOT_TAR" -mtime "-$DAYS_FRESH" 2>/dev/null) ]]; then return 0; fi
  mmdebstrap --mode=root --variant=minbase --include=systemd --skip=cleanup/apt/lists --format=tar \
    --quiet bookworm "$ROOT_TAR.new" >"$WORK/mmdebstrap.log" 2>&1 ||
    { tail -n 30 "$WORK/mmdebstrap.log"; return 1; }
  mv "$ROOT_TAR.new" "$ROOT_TAR"
}

# dpkg does not sync, which would take most of the time.
unpack_root() {
  local name
  rm -rf --one-file-system "$ROOT"
  mkdir -p "$ROOT"
  tar -C "$ROOT" --numeric-owner --exclude='./dev/*' -xf "$ROOT_TAR" || return 1
  mkdir "$ROOT/packages"
  for name in null zero full random urandom tty; do touch "$ROOT/dev/$name"; done
  echo force-unsafe-io >"$ROOT/etc/dpkg/dpkg.cfg.d/package_test"
}

# Run before the chroot: devices and kernel settings are the machine's, and the settings are
# read-only.
readonly MOUNTS='
  set -e
  cd "$1"
  for name in null zero full random urandom tty; do mount -n --bind /dev/$name dev/$name; done
  mount -n -t proc proc proc
  mount -n --bind proc/sys proc/sys
  mount -n -o remount,bind,ro proc/sys
  shift
'

# in_root COMMAND...: with a process 1 of its own, as in a container without systemd.
in_root() {
  unshare --mount --propagation unchanged --pid --ipc --fork --kill-child \
    sh -c "$MOUNTS"'exec chroot . /usr/bin/env -i HOME=/root DEBIAN_FRONTEND=noninteractive \
      PATH='"$INSIDE_PATH"' "$@"' sh "$ROOT" "$@" </dev/null
}

# quietly COMMAND...: shows what it prints when it fails
quietly() {
  "$@" >"$WORK/log" 2>&1 || { tail -n 30 "$WORK/log"; return 1; }
}

in_root_quietly() {
  quietly in_root "$@"
}

# Every file in the root, without the databases of dpkg, apt and systemd.
files_in_root() {
  (cd "$ROOT" && find . \( -path ./proc -o -path ./sys -o -path ./dev -o -path ./packages \
    -o -path ./var/lib/dpkg -o -path ./var/lib/apt -o -path ./var/cache -o -path ./var/log \
    -o -path './var/lib/systemd/deb-systemd-helper-*' -o -path ./var/lib/systemd/timers \
    -o -path ./run/systemd \) -prune \
    -o -printf '%P %y %#m %U:%G %l\n' | sort)
}

differences_from() {
  files_in_root | diff "$1" - | sed -n 's/^\([<>]\) \([^ ]*\) .*/\1 \2/p' | tr '\n' ' '
}

deb_names() {
  (cd "$DEBS" && ls -- *.deb) | sed 's/_.*//' | grep -v dbgsym | sort | tr '\n' ' '
}

copy_packages() {
  local name
  for name in "${PACKAGES[@]}"; do cp "$DEBS/${name}"_[0-9]*.deb "$ROOT/packages"; done
}

# The first time from the lists that the root was made with, unless the mirror has gone on since.
install_by_apt() {
  local -a install=(apt-get install -qq -y --no-install-recommends)
  in_root_quietly sh -c "${install[*]} /packages/*.deb" ||
    in_root_quietly sh -c "apt-get update -qq && ${install[*]} /packages/*.deb"
}

install_by_dpkg() {
  in_root_quietly sh -c 'dpkg -i /packages/*.deb'
}

# ---- what is installed -------------------------------------------------------------------------

LIB=usr/lib/$(gcc -print-multiarch)
readonly LIB

# Manual pages of functions are counted by a test of their own.
installed_files() {
  local name
  for name in "${PACKAGES[@]}"; do
    in_root dpkg -L "$name" | grep -vE '^/usr/share/(doc/|man/man3)' | while read -r file; do
      if [[ -d $ROOT$file && $file != /usr/zelo* ]]; then continue; fi
      stat -c "$name %A %U:%G ${file#/}" "$ROOT$file"
    done
  done | sort -u
}

expected_files() {
  sed "s|usr/LIB|$LIB|" <<'FILES' | sort
libzelocore -rw-r--r-- root:root usr/LIB/libzelocore.so
libzelosdk -rw-r--r-- root:root usr/LIB/libzelosdk.so
libzelosdk -rw-r--r-- root:root usr/share/lintian/overrides/libzelosdk
libzelocore -rw-r--r-- root:root usr/share/lintian/overrides/libzelocore
libzelosdk drwxr-xr-x root:root usr/zelo
libzelosdk drwxr-xr-x root:root usr/zelo/etc
libzeloscheduler4 -rw-r--r-- root:root usr/LIB/libzeloscheduler.so.4
libzeloscheduler4 -rw-r--r-- root:root usr/lib/tmpfiles.d/libzeloscheduler4.conf
libzeloscheduler4 -rwxr-xr-x root:root etc/init.d/zeloscheduler-names
libzeloscheduler4 -rwxr-xr-x root:root usr/LIB/zeloscheduler/take-names
libzeloscheduler4 lrwxrwxrwx root:root lib/systemd/system/zeloscheduler-names.service
libzeloscheduler4 -rwxr-xr-x root:root usr/share/zeloscheduler/take_lines_out
libzeloscheduler4 -rwxr-xr-x root:root usr/share/zeloscheduler/zeloschedtask.stand-in
libzeloscheduler4 -rw-r--r-- root:root usr/share/lintian/overrides/libzeloscheduler4
libzeloscheduler4 drwxr-xr-x root:root usr/zelo
libzeloscheduler4 drwxr-xr-x root:root usr/zelo/etc
libzeloscheduler4 drwxr-xr-x root:root usr/zelo/libexec
libzeloscheduler4 drwxr-xr-x root:root usr/zelo/libexec/plugins
libzeloscheduler4 drwxr-xr-x root:root usr/zelo/libexec/plugins/task_scheduler.d
libzeloscheduler-dev -rw-r--r-- root:root usr/LIB/cmake/zeloscheduler/zeloscheduler-config-version.cmake
libzeloscheduler-dev -rw-r--r-- root:root usr/LIB/cmake/zeloscheduler/zeloscheduler-config.cmake
libzeloscheduler-dev -rw-r--r-- root:root usr/LIB/cmake/zeloscheduler/zeloscheduler-targets-none.cmake
libzeloscheduler-dev -rw-r--r-- root:root usr/LIB/cmake/zeloscheduler/zeloscheduler-targets.cmake
libzeloscheduler-dev -rw-r--r-- root:root usr/LIB/pkgconfig/zeloscheduler.pc
libzeloscheduler-dev -rw-r--r-- root:root usr/include/zelocore.h
libzeloscheduler-dev -rw-r--r-- root:root usr/include/zelosched.h
libzeloscheduler-dev -rw-r--r-- root:root usr/include/zeloschedgetter.h
libzeloscheduler-dev -rw-r--r-- root:root usr/include/zeloschedsetter.h
libzeloscheduler-dev -rw-r--r-- root:root usr/include/zelosdk.h
libzeloscheduler-dev -rw-r--r-- root:root usr/share/man/man7/zelosched.7.gz
libzeloscheduler-dev lrwxrwxrwx root:root usr/LIB/libzeloscheduler.so
zeloscheduler-tools -rw-r--r-- root:root lib/systemd/system/zelosched-catch-up.service
zeloscheduler-tools -rw-r--r-- root:root lib/systemd/system/zelosched-history.service
zeloscheduler-tools -rw-r--r-- root:root lib/systemd/system/zelosched-history.timer
zeloscheduler-tools -rw-r--r-- root:root lib/systemd/system/zelosched-metrics.service
zeloscheduler-tools -rw-r--r-- root:root lib/systemd/system/zelosched-metrics.timer
zeloscheduler-tools -rw-r--r-- root:root lib/systemd/system/zelosched-restore.service
zeloscheduler-tools -rw-r--r-- root:root lib/systemd/system/zelosched-shutdown.service
zeloscheduler-tools -rw-r--r-- root:root usr/lib/tmpfiles.d/libzeloscheduler-program.conf
zeloscheduler-tools -rw-r--r-- root:root usr/share/bash-completion/completions/zelosched
zeloscheduler-tools -rw-r--r-- root:root usr/share/fish/vendor_completions.d/zelosched.fish
zeloscheduler-tools -rw-r--r-- root:root usr/share/lintian/overrides/zeloscheduler-tools
zeloscheduler-tools -rw-r--r-- root:root usr/share/man/man5/zelosched-json.5.gz
zeloscheduler-tools -rw-r--r-- root:root usr/share/man/man5/zelosched.conf.5.gz
zeloscheduler-tools -rw-r--r-- root:root usr/share/man/man8/zelosched.8.gz
zeloscheduler-tools -rw-r--r-- root:root usr/share/man/man8/zeloschedtask.8.gz
zeloscheduler-tools -rw-r--r-- root:root usr/share/zelosched/zelosched-1.schema.json
zeloscheduler-tools -rwxr-xr-x root:root usr/share/zelosched/mail-on-failure
zeloscheduler-tools -rw-r--r-- root:root usr/share/zelosched/zelosched.rules.yml
zeloscheduler-tools -rw-r--r-- root:root usr/share/zsh/vendor-completions/_zelosched
zeloscheduler-tools -rwxr-xr-x root:root etc/init.d/zelosched-restore
zeloscheduler-tools -rwxr-xr-x root:root usr/sbin/zelosched
zeloscheduler-tools -rwxr-xr-x root:root usr/sbin/zeloschedtask
zeloscheduler-tools -rwxr-xr-x root:root usr/zelo/bin/zelo_poweroff_feasible_check
zeloscheduler-tools drwxr-xr-x root:root usr/zelo
zeloscheduler-tools drwxr-xr-x root:root usr/zelo/bin
zeloscheduler-tools drwxr-xr-x root:root usr/zelo/var
FILES
}

task_program_is_installed() {
  cmp "$ROOT/tmp/zeloschedtask" "$ROOT/usr/sbin/zeloschedtask" &&
    same "$(stat -c '%a %u' "$ROOT/tmp/zeloschedtask")" "755 0"
}

# An image is made in a plain chroot, whose process 1 is the machine's.
leaves_tmp_of_image() {
  rm "$ROOT/tmp/zeloschedtask"
  quietly unshare --mount --propagation unchanged sh -c "$MOUNTS"'exec chroot . /usr/bin/env -i \
    PATH='"$INSIDE_PATH"' "$@"' sh "$ROOT" /var/lib/dpkg/info/zeloscheduler-tools.postinst configure &&
    [[ ! -e $ROOT/tmp/zeloschedtask ]]
}

units_are_verified() {
  in_root sh -c 'systemd-analyze verify --man=no /lib/systemd/system/zelosched-* 2>&1' >"$WORK/log" &&
    same "$(cat "$WORK/log")" ""
}

enabled_units() {
  (cd "$ROOT/etc/systemd/system" && find . -name 'zelosched*' | sort | tr '\n' ' ')
}

# ---- the demonstration -----------------------------------------------------------------------

# Built against what is installed in the root, and nothing else.
build_for_demo() {
  local -a flags
  mkdir -p "$ROOT/demo/build/tests" "$ROOT/demo/scripts" "$ROOT/demo/tests/support"
  read -ra flags < <(PKG_CONFIG_LIBDIR=$ROOT/$LIB/pkgconfig pkg-config --cflags --libs zeloscheduler)
  [[ ${flags[*]} == *"$ROOT"* ]] || { echo "flags: ${flags[*]}"; return 1; }
  gcc "$checkout/tests/support/demo_tasks.c" "${flags[@]}" -o "$ROOT/demo/build/tests/demo_tasks" &&
    cp "$BUILD_DIR/tests/syslog_to_file.so" "$ROOT/demo/build/tests" &&
    cp "$checkout/scripts/demo" "$ROOT/demo/scripts" &&
    cp "$checkout/tests/support/start_cron.sh" "$ROOT/demo/tests/support"
}

run_demo() {
  in_root_quietly env ZELO_DEMO_STAGE=installed BUILD_DIR=/demo/build /demo/scripts/demo &&
    grep -q 'recorded as finished' "$WORK/log"
}

# What belongs to the demonstration, not to the packages.
clear_demo() {
  rm -rf "$ROOT/demo" "$ROOT/tmp/ids" "$ROOT/tmp/saved" "$ROOT/tmp/cron.log"
  rm -f "$ROOT/run/crond.pid" "$ROOT/run/crond.reboot"
}

# ---- systemd -----------------------------------------------------------------------------------

readonly CGROUPS=/run/package_test_cgroups
OWN_CGROUP=
readonly NOT_IN_CONTAINERS=(systemd-sysctl systemd-modules-load systemd-binfmt systemd-udevd
  systemd-udev-trigger systemd-random-seed e2scrub_reap)

# Fails where the machine gives no cgroups to a container.
has_own_cgroup() {
  mkdir -p "$CGROUPS"
  { mountpoint -q "$CGROUPS" || mount -n -t cgroup2 cgroup2 "$CGROUPS" 2>/dev/null; } &&
    OWN_CGROUP=$(mktemp -d "$CGROUPS/package_test.XXXXXX" 2>/dev/null) &&
    unshare --cgroup --net true
}

leave_cgroup() {
  if [[ -d $OWN_CGROUP ]]; then find "$OWN_CGROUP" -depth -type d -exec rmdir {} + || true; fi
}

settings_of_machine() {
  sysctl -a --pattern '^(fs\.protected|kernel\.(pid_max|core_|sysrq|hostname|printk))' 2>/dev/null
}

# A unit that runs what a test wants once all is up, and then switches off.
prepare_for_boot() {
  local name
  for name in "${NOT_IN_CONTAINERS[@]}"; do ln -s /dev/null "$ROOT/etc/systemd/system/$name.service"; done
  cat >"$ROOT/etc/systemd/system/probe.service" <<'UNIT'
[Unit]
After=cron.service systemd-user-sessions.service zelosched-restore.service zelosched-catch-up.service

[Service]
Type=oneshot
ExecStart=-/bin/sh /probe
ExecStart=/bin/kill -s RTMIN+4 1
StandardOutput=append:/probe.log
StandardError=append:/probe.log
UNIT
  ln -s ../probe.service "$ROOT/etc/systemd/system/multi-user.target.wants/probe.service"
}

clear_boot() {
  local name
  for name in "${NOT_IN_CONTAINERS[@]}"; do rm "$ROOT/etc/systemd/system/$name.service"; done
  rm -f "$ROOT/etc/systemd/system/probe.service" "$ROOT/probe" "$ROOT/probe.log" \
    "$ROOT/etc/systemd/system/multi-user.target.wants/probe.service"
}

# Each boot has an id of its own, an empty /run and an empty /tmp. Systemd gets no right to change
# the machine's clock or kernel, and a /sys with nothing but its cgroup.
readonly BOOT_MOUNTS='
  cd "$1"
  mount -n --bind . .
  cd "$1"
  mount -n -t tmpfs -o mode=0755 run run
  mount -n -t tmpfs -o mode=1777 tmp tmp
  mount -n -t tmpfs -o mode=0755 sys sys
  mkdir -p sys/fs/cgroup
  mount -n -t cgroup2 cgroup2 sys/fs/cgroup
  mount -n -t tmpfs -o mode=0755 dev dev
  mkdir dev/shm dev/pts
  ln -s /proc/self/fd dev/fd
  ln -s ../run/systemd/journal/dev-log dev/log
  for name in null zero full random urandom tty console; do touch dev/$name; done
  cat /proc/sys/kernel/random/uuid >run/boot_id
'
readonly BOOT_ID='mount -n --bind run/boot_id proc/sys/kernel/random/boot_id; '

# boot COMMANDS: boots the root, runs them in it, switches off, and prints what they printed
boot() {
  local status=0
  echo "$1" >"$ROOT/probe"
  rm -f "$ROOT/probe.log"
  (echo "$BASHPID" >"$OWN_CGROUP/cgroup.procs" && exec timeout "$BOOT_PATIENCE" \
    unshare --mount --propagation unchanged --pid --ipc --uts --net --cgroup --fork --kill-child \
    setpriv --bounding-set=-sys_time,-sys_module,-sys_boot,-sys_rawio,-syslog \
    sh -c "set -e; $BOOT_MOUNTS $MOUNTS $BOOT_ID"'exec chroot . env -i container=package_test \
      PATH='"$INSIDE_PATH"' /lib/systemd/systemd --show-status=0 --log-target=journal' sh "$ROOT") \
    >"$WORK/boot.log" 2>&1 </dev/null || status=$?
  cat "$ROOT/probe.log" 2>/dev/null || { echo "no boot: status $status"; tail -n 20 "$WORK/boot.log"; }
}

readonly STARTED_AT='
  at() { systemctl show -P "$1" "$2"; }
  restored=$(at ActiveEnterTimestampMonotonic zelosched-restore)
  [ "$restored" -gt 0 ] || echo "not restored"
  for unit in cron systemd-user-sessions; do
    [ "$restored" -le "$(at ExecMainStartTimestampMonotonic $unit)" ] && echo "before $unit"
  done
  systemctl list-units --failed --plain --no-legend "zelosched*"
  cmp /tmp/scheduled_tasks /usr/zelo/etc/scheduled_tasks && echo restored
  stat -c "%a %U" /tmp/scheduled_tasks /tmp/zeloschedtask
  zelosched run "$(cat /task)" --wait >/dev/null && echo ran
  systemctl is-active zelosched-history.timer
  systemctl start zelosched-history && zelosched history "$(cat /task)" --json | grep -c finished
  systemctl is-active zelosched-catch-up
  zelosched run "$(cat /task)" --wait >/dev/null && echo ran'

# How many finished runs of the task the history has.
kept_runs() {
  in_root zelosched history "$(cat "$ROOT/task")" | grep -c finished || true
}

# As if the machine had been off for hours, and the tasks had been there before.
was_off() {
  in_root sqlite3 /usr/zelo/var/history.sqlite "DELETE FROM boot; UPDATE run SET moment = moment - 10000;
    UPDATE task SET changed = changed - 10000 WHERE name = 'Catch up'"
}

readonly NAMES=(/tmp/scheduled_tasks /tmp/zeloschedtask /tmp/lock /tmp/lock/lock_sched_run
  /tmp/sched_status.sqlite /tmp/sched_status.sqlite-journal)
readonly NAMES_ARE_ROOTS="stat -c '%U %a' ${NAMES[*]} | tr '\n' ' '"
readonly ALL_ROOTS="root 644 root 755 root 755 root 600 root 600 root 600 "

names_are_roots() {
  same "$(in_root sh -c "$NAMES_ARE_ROOTS")" "$ALL_ROOTS"
}

# boot_without DIRECTORY COMMANDS: boots with a mount there that fails
boot_without() {
  local unit
  unit=$(tr / - <<<"${1#/}").mount
  printf '[Unit]\nDefaultDependencies=no\n[Mount]\nWhat=nothing\nWhere=%s\nType=nothing\n' "$1" \
    >"$ROOT/etc/systemd/system/$unit"
  mkdir -p "$ROOT/etc/systemd/system/local-fs.target.wants"
  ln -s "../$unit" "$ROOT/etc/systemd/system/local-fs.target.wants/$unit"
  boot "$2"
  rm -r "$ROOT/etc/systemd/system/$unit" "$ROOT/etc/systemd/system/local-fs.target.wants"
}

# A /tmp that outlives the boot, with names of another user in it.
planted_names_are_not_adopted() {
  boot "
    rm -rf ${NAMES[*]}
    cp /bin/true /tmp/zeloschedtask; echo '[1]' >/tmp/scheduled_tasks; mkdir /tmp/lock; : >/tmp/sched_status.sqlite
    chown -R 65534:65534 ${NAMES[*]} 2>/dev/null
    systemd-tmpfiles --create --remove --boot /usr/lib/tmpfiles.d/libzeloscheduler*.conf 2>&1 | grep -v Duplicate
    $NAMES_ARE_ROOTS; stat -c %s /tmp/scheduled_tasks; $WHICH_PROGRAM" >"$WORK/log"
  same "$(cat "$WORK/log")" "${ALL_ROOTS}0
program"
}

# As when another process holds the lock for too long: flock fails.
leaves_lines_of_a_held_lock() {
  in_root sh -c 'mkdir /stub && printf "#!/bin/sh\nexit 1\n" >/stub/flock && chmod 755 /stub/flock
    PATH=/stub:$PATH /usr/share/zeloscheduler/take_lines_out /tmp/zeloschedtask' >"$WORK/log" 2>&1 &&
    { echo "the lines were taken out"; return 1; }
  rm -r "$ROOT/stub"
  grep -q 'another process has been changing tasks' "$WORK/log" && has_all_lines
}

takes_names_by_init() {
  rm -rf "${NAMES[@]/#/$ROOT}"
  in_root_quietly /etc/init.d/zeloscheduler-names start && names_are_roots &&
    in_root_quietly /etc/init.d/zelosched-restore start && names_are_roots &&
    cmp "$ROOT/tmp/scheduled_tasks" "$ROOT/usr/zelo/etc/scheduled_tasks"
}

readonly WHICH_PROGRAM='
  cmp -s /tmp/zeloschedtask /usr/sbin/zeloschedtask && echo program
  cmp -s /tmp/zeloschedtask /usr/share/zeloscheduler/zeloschedtask.stand-in && echo stand-in'

# By a program that uses the library alone.
save_by_library() {
  local -a flags
  read -ra flags < <(PKG_CONFIG_LIBDIR=$ROOT/$LIB/pkgconfig pkg-config --cflags --libs zeloscheduler)
  gcc "$checkout/examples/save_and_list.c" "${flags[@]}" -o "$ROOT/save_and_list" &&
    in_root_quietly /save_and_list "By the library" true && rm "$ROOT/save_and_list"
}

# Another user takes the names first.
plant_names() {
  in_root setpriv --reuid 65534 --regid 65534 --clear-groups sh -c '
    printf "#!/bin/sh\n" >/tmp/zeloschedtask; chmod 755 /tmp/zeloschedtask
    mkdir /tmp/lock /tmp/scheduled_tasks; : >/tmp/sched_status.sqlite'
  # A file of root's, as he can move one there from a directory of his.
  echo planted >"$ROOT/tmp/sched_status.sqlite-journal"
}

readonly CAUGHT_UP='
  eventually() { for tenth in $(seq 200); do "$@" && return; sleep 0.1; done; }
  eventually systemctl --quiet is-active zelosched-catch-up
  eventually test -s /var/caught_up
  systemctl is-active zelosched-catch-up
  sort -u /var/caught_up'

catches_up() {
  rm -f "$ROOT/var/caught_up"
  was_off && in_root_quietly systemctl enable zelosched-catch-up.service &&
    same "$(boot "$CAUGHT_UP")" "$(printf 'active\ncaught up')"
}

catches_nothing_up() {
  rm -f "$ROOT/var/caught_up"
  was_off && same "$(boot 'sleep 1; ls /var/caught_up 2>/dev/null; echo end')" end
}

# ---- removing ---------------------------------------------------------------------------------

lines_in_crontab() {
  grep -cE 'zelosched|zelo_poweroff' "$ROOT/etc/crontab" || true
}

remove_packages() {
  in_root_quietly dpkg --remove "${PACKAGES[@]}"
}

purge_packages() {
  in_root_quietly dpkg --purge "${PACKAGES[@]}"
}

maintainer_script() {
  in_root env DPKG_MAINTSCRIPT_PACKAGE=zeloscheduler-tools "/var/lib/dpkg/info/zeloscheduler-tools.$1" "$2"
}

# A file that something is mounted on cannot be replaced.
goes_on_without_crontab() {
  in_root sh -c 'mount -n --bind /etc/crontab /etc/crontab &&
    /var/lib/dpkg/info/zeloscheduler-tools.prerm remove' >"$WORK/log" 2>&1 &&
    grep -q 'take the lines of the tasks out of /etc/crontab by hand' "$WORK/log" &&
    same "$(cd "$ROOT/etc" && echo crontab*)" crontab
}

is_undone() {
  maintainer_script prerm remove >/dev/null && same "$(lines_in_crontab)" 0 &&
    maintainer_script postinst abort-remove >/dev/null && has_all_lines
}

boots_with_the_library_alone() {
  in_root_quietly zelosched restore && in_root_quietly dpkg --remove zeloscheduler-tools &&
    save_by_library || return 1
  local booted
  booted=$(boot "$NAMES_ARE_ROOTS; $WHICH_PROGRAM; grep -qF /tmp/zeloschedtask /etc/crontab && echo lines")
  install_by_dpkg && same "$booted" "${ALL_ROOTS}stand-in
lines"
}

disarms_clock() {
  local clock=$ROOT/sys/class/rtc/rtc0
  mkdir -p "$clock"
  echo 1234567890 >"$clock/wakealarm"
  in_root_quietly dpkg --remove zeloscheduler-tools && same "$(cat "$clock/wakealarm")" 0 && rm -r "$ROOT/sys/class"
}

# One of them is disabled, and one power-off time has a line too.
tasks_kept() {
  grep -c '^\[' "$ROOT/usr/zelo/etc/scheduled_tasks"
}

has_all_lines() {
  same "$(lines_in_crontab)" "$(tasks_kept)"
}

has_all_tasks() {
  same "$(task_count)" "$(($(tasks_kept) + 1))"
}

task_count() {
  in_root zelosched list --power --json | grep -c '"id"' || true
}

# ---- the tests ----------------------------------------------------------------------------------

trap leave_cgroup EXIT
check "packages are built, and lintian finds no fault" quietly "$checkout/scripts/package" "$DEBS"
check "they are the library, the platform, what builds on it, the tools, and the page" \
  same "$(deb_names)" "$(printf '%s\n' "${PACKAGES[@]}" "$PAGE_PACKAGE" | sort | tr '\n' ' ')"
check "a small root is made" make_root_tar
check "and unpacked" unpack_root
copy_packages

check "apt installs them with what they depend on, and no more" install_by_apt
check "apt removes them" in_root_quietly apt-get purge -qq -y "${PACKAGES[@]}"
files_in_root >"$WORK/before"
cp "$ROOT/etc/crontab" "$WORK/crontab"
check "no name of theirs is left" same "$(grep -E "$OUR_TRACES" "$WORK/before")" ""

plant_names
check "dpkg installs them" install_by_dpkg
check "names in /tmp that were there before are root's and made anew" names_are_roots
rm -r "$ROOT"/tmp/zeloscheduler.*
check "files, owners and modes are right" same "$(installed_files)" "$(expected_files)"
check "the program that cron starts stands in /tmp at once" task_program_is_installed
check "in an image that is being made, nothing is put into /tmp" leaves_tmp_of_image
check "the units are verified" units_are_verified
check "all but the making up for missed runs is enabled" same "$(enabled_units)" \
  "./basic.target.wants/zelosched-restore.service ./multi-user.target.wants/zelosched-shutdown.service ./timers.target.wants/zelosched-history.timer "
check "a program is built against what is installed" build_for_demo
check "the demonstration runs with what is installed" run_demo
clear_demo

in_root zelosched add --daily 00:00 --name Run --quiet -- true >"$ROOT/task"
check "a task that is due every hour is saved" in_root_quietly zelosched add --daily 00:00 --every 1h \
  --name "Catch up" -- 'echo caught up >>/var/caught_up'
check "a power time is saved" in_root_quietly zelosched power add off --daily 23:00
check "the crontab has the lines" same "$(lines_in_crontab)" 5

if has_own_cgroup; then
  settings=$(settings_of_machine)
  prepare_for_boot
  rm -f "$ROOT/tmp/scheduled_tasks"
  check "systemd restores before cron and logins, and keeps the history" same "$(boot "$STARTED_AT")" \
    "$(printf '%s\n' 'before cron' 'before systemd-user-sessions' restored '644 root' '755 root' ran \
      active 1 inactive ran)"
  check "the last run is kept at shutdown" same "$(kept_runs)" 2
  check "missed runs are not made up for" catches_nothing_up
  check "they are where that is switched on" catches_up
  in_root_quietly systemctl disable zelosched-catch-up.service
  check "without the file system of the history the tasks are restored all the same" \
    same "$(boot_without /usr/zelo/var "$NAMES_ARE_ROOTS; cmp /tmp/scheduled_tasks /usr/zelo/etc/scheduled_tasks && echo restored; $WHICH_PROGRAM")" \
    "${ALL_ROOTS}restored
program"
  check "without that of the tasks none is, and the names in /tmp are root's" \
    same "$(boot_without /usr/zelo/etc "$NAMES_ARE_ROOTS; systemctl is-active zelosched-restore; $WHICH_PROGRAM")" \
    "${ALL_ROOTS}inactive
program"
  check "what another user has in a /tmp that outlives the boot does not become root's" planted_names_are_not_adopted
  check "systemd restores where the library alone names the program" boots_with_the_library_alone
  clear_boot
  check "the machine's kernel settings are as they were" same "$(settings_of_machine)" "$settings"
else
  skip "systemd restores before cron and logins, and keeps the history" "no cgroup of its own here"
fi
rm -f "$ROOT/task" "$ROOT/var/caught_up"
in_root_quietly zelosched restore

echo old >"$ROOT/tmp/zeloschedtask"
check "an upgrade goes through" install_by_dpkg
check "it puts the new program into /tmp" task_program_is_installed
check "it keeps the tasks" has_all_tasks
check "it keeps the lines in the crontab" has_all_lines

check "a crontab that cannot be replaced is told, and stays" goes_on_without_crontab
check "nor are lines taken out without the lock of changes" leaves_lines_of_a_held_lock
check "a removal that is broken off is undone" is_undone
check "without systemd the boot scripts take the names and restore" takes_names_by_init
check "the tools alone are removed, and the clock is disarmed" disarms_clock
check "the lines are out of the crontab" cmp "$ROOT/etc/crontab" "$WORK/crontab"
check "the tasks stay with the library" cmp "$ROOT/tmp/scheduled_tasks" "$ROOT/usr/zelo/etc/scheduled_tasks"
check "the program of the crontab lines has a stand-in" \
  cmp "$ROOT/tmp/zeloschedtask" "$ROOT/usr/share/zeloscheduler/zeloschedtask.stand-in"
check "what saves a task by the library alone finds it root's" save_by_library
check "and the names in /tmp too" names_are_roots
check "the tools are installed again" install_by_dpkg
check "the lines are back" has_all_lines

check "all are removed" remove_packages
check "the crontab is as it was" cmp "$ROOT/etc/crontab" "$WORK/crontab"
check "its owner and mode are as they were" same "$(stat -c '%a %u:%g' "$ROOT/etc/crontab")" "644 0:0"
# As of any package, systemd's helper keeps which units were enabled until the purge, and dpkg what
# is configuration.
check "the names in /tmp stay root's while a task is kept" names_are_roots
check "nothing is left but the data, these names, and what the purge takes of units" \
  same "$(differences_from "$WORK/before")" "$(printf '> %s ' \
    etc/init.d/zelosched-restore etc/init.d/zeloscheduler-names \
    etc/rcS.d/S01zelosched-restore etc/rcS.d/S01zeloscheduler-names \
    etc/systemd/system/basic.target.wants \
    etc/systemd/system/{basic.target.wants/zelosched-restore.service,multi-user.target.wants/zelosched-shutdown.service,timers.target.wants/zelosched-history.timer} \
    run/zeloscheduler.lock \
    tmp/lock tmp/lock/lock_sched_run tmp/sched_status.sqlite{,-journal} tmp/scheduled_tasks \
    tmp/zeloschedtask usr/zelo usr/zelo/etc \
    usr/zelo/etc/{power_sched.conf,scheduled_tasks,scheduled_tasks.last-good} \
    usr/zelo/var usr/zelo/var/history.sqlite)"
mv "$ROOT/usr/zelo/etc/scheduled_tasks" "$ROOT/kept"
rm -rf "${NAMES[@]/#/$ROOT}"
echo "# planted" >"$ROOT/tmp/scheduled_tasks"
echo "# planted" >"$ROOT/tmp/zeloschedtask"
mv "$ROOT/kept" "$ROOT/usr/zelo/etc/scheduled_tasks"
check "all are installed again" install_by_dpkg
check "what was root's under a free name before is replaced" \
  same "$(grep -l planted "$ROOT/tmp/scheduled_tasks" "$ROOT/tmp/zeloschedtask")" ""
check "the tasks are there again" has_all_tasks
check "and their lines" has_all_lines
check "failures are mailed when that is switched on" same "$(in_root zelosched mail on --to-owners 2>/dev/null)" \
  "failures are mailed to the owners of the tasks"
check "all are purged" purge_packages
check "nothing is left at all" same "$(differences_from "$WORK/before")" ""
check "the crontab is as it was before" cmp "$ROOT/etc/crontab" "$WORK/crontab"
page_is_tested
rm -rf --one-file-system "$ROOT"
finish
