#!/bin/bash
# The library's binary interface is the one that is checked in: the exported names, and the layout of
# every type that a caller can see. CONTRIBUTING.md says how to take a change of it in.
#
#   tests/abi_test.sh --update    writes tests/exported_names.txt and tests/abi/*.xml anew; of other
#                                 processors those that are built (scripts/build --target)
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
: "${BUILD_DIR:=$here/../build}"
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"

readonly LIBRARY=$BUILD_DIR/lib/libzeloscheduler.so.4
readonly NAMES=$here/exported_names.txt
machine=$(gcc -dumpmachine)
readonly BASELINE=$here/abi/libzeloscheduler.so.4-$machine.xml
readonly HEADERS=${here%/tests}/libzeloscheduler/include
export LC_ALL=C

exported_names() {
  nm -D --defined-only --with-symbol-versions "$LIBRARY" | awk '$2 != "A" { print $3 }' | sort
}

# write_baseline LIBRARY FILE: Types that only the library sees are no part of it, nor are places in the source.
write_baseline() {
  abidw --headers-dir "$HEADERS" --drop-private-types --exported-interfaces-only --no-show-locs \
    --no-corpus-path --no-comp-dir-path --no-elf-needed "$1" |
    sed "s|path='[^']*/libzeloscheduler/|path='|" >"$2"
}

has_no_difference() {
  abidiff --exported-interfaces-only "$1" "$LIBRARY"
}

finds_a_change() {
  local changed=/tmp/abi_test.xml
  sed "s/$1/$2/g" "$BASELINE" >"$changed"
  ! cmp -s "$changed" "$BASELINE" && ! has_no_difference "$changed" >/dev/null
}

if [[ ${1:-} == --update ]]; then
  exported_names >"$NAMES"
  mkdir -p "$(dirname "$BASELINE")"
  write_baseline "$LIBRARY" "$BASELINE"
  for target in arm64:aarch64-linux-gnu armhf:arm-linux-gnueabihf; do
    other=$BUILD_DIR/cross/${target%%:*}/lib/libzeloscheduler.so.4
    if [[ -e $other ]]; then write_baseline "$other" "$here/abi/libzeloscheduler.so.4-${target#*:}.xml"; fi
  done
  exit
fi

check "the exported names are those of tests/exported_names.txt" \
  same "$(exported_names)" "$(cat "$NAMES")"
if [[ ! -e $BASELINE ]]; then
  skip "the binary interface is the checked-in one" "there is none for $machine"
elif ! readelf -S "$LIBRARY" | grep '\.debug_info' >/dev/null; then
  skip "the binary interface is the checked-in one" "this build has no debug information"
else
  check "the binary interface is the checked-in one" has_no_difference "$BASELINE"
  check "a field that moves would be found" finds_a_change "layout-offset-in-bits='128'" \
    "layout-offset-in-bits='192'"
  check "a name that changes would be found" finds_a_change "\(ZELOSchedTaskSave\)\([@']\)" \
    '\1d\2'
fi
finish
