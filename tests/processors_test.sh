#!/bin/bash
# The other processors: built without a warning, tested by their emulators, and what one has stored is
# read alike by the others. In the long form (ZELO_SOAK_FACTOR) all of the product as it is delivered, all
# programs, and the other order of bytes; in the short one what is cheap to compile and differs most.
#
# Functions are called by check, and what is in single quotes is for another shell:
# shellcheck disable=SC2016,SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
root=$(cd "$here/.." && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"

readonly WORK=$BUILD_DIR/processors_test
readonly TARGETS=(arm64 armhf)
readonly OTHER_ORDER=s390x # big-endian; of the product what stores and reads
declare -rA EMULATORS=([arm64]=qemu-aarch64-static [armhf]=qemu-arm-static [s390x]=qemu-s390x-static)
# What has to do with the width of numbers, the sign of characters, and the order of bytes.
readonly FORMS=(schedule_test zelocore_section_file_test sched_parm_table_test sched_task_convert_test
  sched_task_convert_to_json_string_test backend_zeloautopower_test zelosdk_test)
readonly SHORT=("${FORMS[@]}" sched_date_test sched_util_test owners_rights_test)
readonly OTHER_ORDER_FORMS=("${FORMS[@]}" zelocore_err_test zelocore_szhash_test
  hash_round_trip_property_test sched_task_save_from_json_string_test accessors_test sched_record_test
  power_platform_test zelosched_task_json_test)
# Compiling the tools takes as long as all else; of both processors, this one's types differ.
declare -rA SHORT_TOOLS=([armhf]="zelosched zeloschedtask zeloschedtask_test zelosched_task_json_test
  sched_task_db_test sched_task_plugin_test power_platform_test")
# Programs that map files or ask for the size of a page: SQLite's, and those of the store.
readonly WITH_PAGES=(sched_db_vfs_test store_reader_test sched_shared_names_test)
export JOBS=${JOBS:-2} PROGRAMS_AT_ONCE=2
umask 022
mkdir -p "$WORK"

# An unknown one, for which a root would be made first.
is_refused() {
  local status=0
  "$@" >"$WORK/log" 2>&1 || status=$?
  test "$status" -ne 0 && grep -q "no processor '.*': there are arm64 and armhf" "$WORK/log"
}

# A name of nothing would leave nothing out, and nobody would know.
names_what_is_there() {
  local test name reason
  while read -r test reason; do
    test -e "$here/qemu/$reason.c" || { echo "$reason.c is not there"; return 1; }
    name=${test#*/}
    grep -qE "^TEST(_F|_P)?\(${name%%.*}, $(cut -d. -f2 <<<"${name%/\*}")\)" "$here"/*_test.cpp ||
      test -e "$here/$test.cpp" || { echo "$test is not there"; return 1; }
  done <<<"$(grep '^[^#]' "$here/qemu/cannot.txt")" # as a chroot without /proc has no /dev/fd
}

check "what is left out is there" names_what_is_there
check "no other processor is built for" eval \
  'is_refused "$root/scripts/build" --target arm && is_refused "$root/scripts/build" --target arm64x'
check "nor packaged for" eval \
  'is_refused "$root/scripts/package" --target s390x && is_refused "$root/scripts/package" --target'

if ((EUID != 0)) || ! grep -q '^ *0 *0 ' /proc/self/uid_map 2>/dev/null && [[ -e /proc/self/uid_map ]]; then
  skip "other processors are built for and tested" "only root can make a root for their compilers"
  finish
fi

if [[ -n ${ZELO_SOAK_FACTOR:-} ]]; then
  readonly CROSS=$BUILD_DIR/cross
  quick=()
else
  readonly CROSS=$BUILD_DIR/quick
  quick=(--quick)
fi
cross_root=("$root/scripts/cross-root" "${quick[@]}")

# quietly COMMAND...: shows the end of what it prints when it fails
quietly() {
  "$@" >"$WORK/log" 2>&1 || { tail -n 40 "$WORK/log"; return 1; }
}

builds() {
  quietly "$root/scripts/build" "${quick[@]:---target}" "$@" && ! grep -i 'warning:' "$WORK/log"
}

# Shows how many passed.
passes() {
  local status=0
  "${cross_root[@]}" "$here/qemu/run_tests.sh" "${quick[@]}" "$@" >"$WORK/log" 2>&1 || status=$?
  grep -E '^(FAILED|    |skip)' "$WORK/log" || true
  echo "# $1: $(tail -n 1 "$WORK/log")"
  return "$status"
}

# But for one that the emulator breaks (no_spawn_error).
platform_is_right() {
  "${cross_root[@]}" "$root/scripts/sandbox" bash -c "$CLOCK; \"\$@\"" bash "${EMULATORS[$1]}" \
    "$CROSS/$1/tests/platform_check" --system /usr/zelo/libexec/plugins/platform_check.d >"$WORK/log" || true
  same "$(grep -v '^ok ' "$WORK/log")" "not ok QLIBCExec: -1 when the program cannot be started" &&
    test "$(grep -c '^ok ' "$WORK/log")" -ge 170
}

# No test may arm the machine's own clock.
readonly CLOCK='mount -n -t tmpfs sys /sys && mkdir -p /sys/class/rtc/rtc0 && : >/sys/class/rtc/rtc0/wakealarm'

# in_sandbox_of TARGET COMMANDS: with "forms" as this processor's program; "own" is the machine
in_sandbox_of() {
  local target=$1 commands="$CLOCK; cd $WORK; $2" program=$CROSS/$1/tests/stored_forms
  if [[ $target == own ]]; then
    "$root/scripts/sandbox" bash -c "forms() { '$BUILD_DIR/tests/stored_forms' \"\$1\"; }; $commands"
  else
    "${cross_root[@]}" "$root/scripts/sandbox" bash -c "forms() { ${EMULATORS[$target]} $program \"\$1\"; }; $commands"
  fi
}

readonly STORED=/usr/zelo/etc

stores() {
  in_sandbox_of "$1" "mkdir -p $1 && forms save && cp $STORED/scheduled_tasks $STORED/power_sched.conf $1 &&
    forms print >$1/printed" >"$WORK/log" 2>&1 || { cat "$WORK/log"; return 1; }
}

stores_the_same() {
  local file
  for file in scheduled_tasks power_sched.conf printed; do cmp "$WORK/own/$file" "$WORK/$1/$file" || return 1; done
}

reads_what_stored() {
  in_sandbox_of "$1" "cp $2/power_sched.conf $STORED && cp $2/scheduled_tasks $STORED &&
    install -m 0644 $2/scheduled_tasks /tmp/scheduled_tasks && forms print | cmp - $2/printed"
}

reasons() {
  sed -n 's/^[A-Z].* \([a-z_]*\)$/\1/p' "$here/qemu/cannot.txt" | sort -u
  echo no_subreaper
}

# Where two signals race, the emulator is sometimes fast enough.
fails_at_times() {
  local try
  for try in {1..20}; do "$@" || return 0; done
  echo "never failed in $try tries"
  return 1
}

# The machine can what the emulator cannot. Whoever calls this may ignore signals (nohup), which the
# programs would inherit, and a chroot may be without /proc.
is_shown() {
  local name=qemu_$1 target
  env --default-signal "$root/scripts/sandbox" "$BUILD_DIR/tests/$name" || { echo "$1 fails here"; return 1; }
  for target in "${TARGETS[@]}"; do
    fails_at_times env --default-signal "${cross_root[@]}" "${EMULATORS[$target]}" "$CROSS/$target/tests/$name" ||
      { echo "$1 succeeds under ${EMULATORS[$target]}"; return 1; }
  done
}

same_interface() {
  local target=$1 library=$CROSS/$1/lib/libzeloscheduler.so.4
  same "$(nm -D --defined-only --with-symbol-versions "$library" | awk '$2 != "A" { print $3 }' | LC_ALL=C sort)" \
    "$(cat "$here/exported_names.txt")" && compgen -G "$here/abi/*-$2.xml" >/dev/null &&
    abidiff --exported-interfaces-only "$here"/abi/*-"$2".xml "$library"
}

# A segment that is aligned for pages of 64 KiB is so for smaller ones.
with_pages() {
  quietly "${cross_root[@]}" env PAGE_SIZE="$1" "$here/qemu/run_tests.sh" arm64 "${WITH_PAGES[@]}"
}

fits_pages_of_64_kib() {
  local file
  for file in "$CROSS/$1"/lib/*.so "$CROSS/$1"/bin/*; do
    ! readelf -lW "$file" | awk '$1 == "LOAD" { print $NF }' | grep -v '^0x10000$' || { echo "$file"; return 1; }
  done
}

# Built and found right by lintian: the libraries and tools for that processor, what is the same everywhere for all.
is_packaged() {
  rm -rf "$WORK/packages"
  quietly "$root/scripts/package" --target "$1" "$WORK/packages" || return 1
  same "$(dpkg-deb -I "$WORK"/packages/zeloscheduler-tools_*_"$1".deb control | sed -n 's/^Architecture: //p')" "$1" &&
    test "$(find "$WORK/packages" -name "*_$1.deb" | wc -l)" -ge 5
}

# Says how long it took.
timed_check() {
  local before=$SECONDS
  check "$@"
  echo "# $((SECONDS - before)) s: $1"
}

timed_check "a root with the compilers is made" quietly "${cross_root[@]}"
mapfile -t shown <<<"$(reasons)"
programs=(stored_forms platform_check "${shown[@]/#/qemu_}")
for target in "${TARGETS[@]}"; do
  if [[ -n ${ZELO_SOAK_FACTOR:-} ]]; then
    timed_check "$target: everything is built" builds "$target"
    timed_check "$target: every program that the emulator can run passes" passes "$target"
    timed_check "$target: its packages are built, and lintian has no objection" is_packaged "$target"
  else
    read -r -d '' -a tools <<<"${SHORT_TOOLS[$target]:-}" || true
    timed_check "$target: the libraries and some tests are built" \
      builds "$target" "${programs[@]}" "${SHORT[@]}" "${tools[@]}"
    timed_check "$target: these pass" passes "$target" "${SHORT[@]}" "${tools[@]}"
  fi
  timed_check "$target: our platform keeps its contracts" platform_is_right "$target"
done
for reason in "${shown[@]}"; do check "what the emulators cannot do is shown: $reason" is_shown "$reason"; done
others=("${TARGETS[@]}")

# Debian's own libraries of armhf are for pages of 4 KiB.
if [[ -n ${ZELO_SOAK_FACTOR:-} ]]; then
  check "arm64: it fits pages of 64 KiB" fits_pages_of_64_kib arm64
  timed_check "arm64: with pages of 16 and 64 KiB the store and the database work" eval \
    'with_pages 16384 && with_pages 65536'
  check "arm64: the interface is the checked-in one" same_interface arm64 aarch64-linux-gnu
  check "armhf: the interface is the checked-in one" same_interface armhf arm-linux-gnueabihf
  timed_check "$OTHER_ORDER: what stores and reads is built" \
    builds "$OTHER_ORDER" stored_forms "${OTHER_ORDER_FORMS[@]}"
  timed_check "$OTHER_ORDER: its tests pass" passes "$OTHER_ORDER" "${OTHER_ORDER_FORMS[@]}"
  others+=("$OTHER_ORDER")
fi

check "this machine stores tasks and power times" stores own
for target in "${others[@]}"; do
  check "$target stores the same bytes, ids and texts" eval "stores $target && stores_the_same $target"
  check "$target reads what this machine stored" reads_what_stored "$target" own
  check "this machine reads what $target stored" reads_what_stored own "$target"
done
finish
