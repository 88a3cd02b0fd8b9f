#!/bin/bash
# Runs test programs of another processor by its emulator, in the root that scripts/cross-root makes:
#
#   scripts/cross-root tests/qemu/run_tests.sh TARGET [NAME...]      all programs, by default
#   scripts/cross-root --quick tests/qemu/run_tests.sh --quick TARGET [NAME...]
#
# Tests that the emulator cannot run are left out (tests/qemu/cannot.txt), and with --quick those that
# take it a minute. $BUILD_DIR is the machine's own build; the programs are those of
# $BUILD_DIR/cross/TARGET, or quick/TARGET. $PAGE_SIZE is a page size other than 4096.
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
root=$(cd "$here/../.." && pwd -P)
builds=cross too_long=
if [[ $1 == --quick ]]; then
  builds=quick
  too_long='*.TextsMadeOfTheWordsOfSqlDoWhatTheirStatementIsForOrNothing:*.TheAlarmIsTheFirstMinuteThatShowsATimeOfTheList'
  shift
fi
target=$1
shift
export BUILD_DIR=$BUILD_DIR/$builds/$target
case $target in
  arm64) emulator=qemu-aarch64-static ;;
  armhf) emulator=qemu-arm-static ;;
  s390x) emulator=qemu-s390x-static ;;
esac
export EMULATOR="$here/emulate.py $emulator${PAGE_SIZE:+ -p $PAGE_SIZE}"
# The emulator is much slower: tests with a length run a tenth of it.
export TIMES_SLOWER=5 ZELO_SOAK_FACTOR=0.1

# The first column of a row is a program or a test of one, the second the programs that show the reason.
tests_left_out() {
  sed -n 's/^\([A-Za-z/]*[.*][^ ]*\) .*/\1/p' "$here/cannot.txt" | tr '\n' ':'
}

programs() {
  local name
  awk '$1 == "gtest" { print $2 }' "$BUILD_DIR/test-programs" | while read -r name; do
    if ! grep -q "^$name " "$here/cannot.txt"; then echo "$name"; fi
  done
}

# Other processes execute these by name, which the kernel can do only with native programs. Scripts
# take their place, in mounts that are private here.
wrap_tools() {
  local tool
  mkdir -p "$BUILD_DIR/bin" "$BUILD_DIR/bin.$target"
  mount -n --bind "$BUILD_DIR/bin" "$BUILD_DIR/bin.$target"
  mount -n -t tmpfs -o mode=0755 tools "$BUILD_DIR/bin"
  for tool in "$BUILD_DIR/bin.$target"/*; do
    [[ -e $tool ]] || continue
    echo "#!/bin/sh
exec $emulator -0 \"\$0\" $tool \"\$@\"" >"$BUILD_DIR/bin/${tool##*/}"
    chmod 755 "$BUILD_DIR/bin/${tool##*/}"
  done
}

GTEST_FILTER=-$(tests_left_out)$too_long
export GTEST_FILTER
wrap_tools
names=("$@")
if ((${#names[@]} == 0)); then mapfile -t names <<<"$(programs)"; fi
exec "$root/scripts/run-tests" "${names[@]}"
