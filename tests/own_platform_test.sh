#!/bin/bash
# The product is built against the platform of an appliance, in a directory of its own, and what was built uses
# that one. It is a copy of ours, in a place where nothing else would look for it.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
root=$(cd "$here/.." && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"

readonly WORK=$BUILD_DIR/own_platform_test
readonly PLATFORM=$WORK/appliance
readonly OWN=$WORK/build
rm -rf "$PLATFORM"
mkdir -p "$PLATFORM/lib" "$PLATFORM/include"

# With the compiler launcher of the machine's own build, and without optimising: this is about libraries.
setting() {
  sed -n "s/^$1:[A-Z]*=//p" "$BUILD_DIR/CMakeCache.txt"
}

configure() {
  cmake -S "$root" -B "$1" -G "$(setting CMAKE_GENERATOR)" -DCMAKE_BUILD_TYPE=Debug -DCMAKE_CXX_FLAGS_DEBUG=-O0 \
    -DCMAKE_CXX_COMPILER_LAUNCHER="$(setting CMAKE_CXX_COMPILER_LAUNCHER)" -DCMAKE_UNITY_BUILD=ON -DZELO_WEB=OFF \
    -DZELO_PLATFORM="$PLATFORM" "${@:2}" >"$WORK/log" 2>&1
}

is_refused() {
  rm -rf "$WORK/refused"
  ! configure "$WORK/refused" "${@:2}" && grep -q "$1" "$WORK/log"
}

# With one header of its own, and one of ours.
make_platform() {
  cp "$BUILD_DIR"/lib/libzelo{core,sdk}.so "$PLATFORM/lib" &&
    cp "$root/platform/libzelocore/include/zelocore.h" "$PLATFORM/include"
}

builds() {
  rm -f "$OWN/CMakeCache.txt" # objects are kept for the next time
  { configure "$OWN" -DZELO_TESTS=OFF -DZELO_BENCH=OFF &&
    cmake --build "$OWN" --parallel "${JOBS:-2}" --target zeloscheduler zelosched >"$WORK/log" 2>&1; } ||
    { tail -n 40 "$WORK/log"; return 1; }
  ! grep -i 'warning:' "$WORK/log"
}

uses_its_headers() {
  local commands=$OWN/compile_commands.json
  grep -qF -- "$PLATFORM/include " "$commands" && grep -qF -- "$root/platform/libzelosdk/include " "$commands" &&
    ! grep -F -- "$root/platform/libzelocore/include " "$commands"
}

builds_none_of_ours() {
  same "$(cd "$OWN/lib" && echo *)" "libzeloscheduler.so libzeloscheduler.so.4"
}

# needs FILE: the two libraries by their names, which the loader finds by the run path
needs() {
  local libraries
  libraries=$(readelf -d "$OWN/$1" | sed -n 's/.*(NEEDED).*\[\(libzelo[cs][od].*\)\]/\1/p' | sort | xargs)
  same "$libraries" "libzelocore.so libzelosdk.so" &&
    readelf -d "$OWN/$1" | grep -qE "\((RUNPATH|RPATH)\).*$PLATFORM/lib\]"
}

loads_them() {
  same "$(ldd "$OWN/bin/zelosched" | sed -n 's/^\tlibzelo\(core\|sdk\)\.so => \(.*\) (.*/\2/p' | sort)" \
    "$PLATFORM/lib/libzelocore.so"$'\n'"$PLATFORM/lib/libzelosdk.so"
}

runs() {
  same "$("$root/scripts/sandbox" "$OWN/bin/zelosched" --version)" \
    "$("$root/scripts/sandbox" "$BUILD_DIR/bin/zelosched" --version)"
}

# On the same store, by its platform and ours.
lists() {
  # shellcheck disable=SC2016
  same "$("$root/scripts/sandbox" bash -c '"$0" add --name one --daily 04:00 -- true >/dev/null &&
    diff <("$0" list --json) <("$1" list --json) && "$1" list --json | grep -c "\"one\""' \
    "$OWN/bin/zelosched" "$BUILD_DIR/bin/zelosched")" 1
}

cannot_do_without() {
  mv "$PLATFORM/lib" "$PLATFORM/none"
  ! "$root/scripts/sandbox" "$OWN/bin/zelosched" --version >"$WORK/log" 2>&1 &&
    grep -q 'libzelo[a-z]*\.so: cannot open shared object file' "$WORK/log"
}

check "a platform without its libraries is refused" is_refused 'zelocore_library' -DZELO_TESTS=OFF -DZELO_BENCH=OFF
check "a platform is made" make_platform
check "our tests are of ours alone" is_refused 'the tests are of our platform'
check "library and command line are built against it" builds
check "with its headers, and ours where it has none" uses_its_headers
check "none of our platform is built" builds_none_of_ours
check "the library needs the platform's by its names" needs lib/libzeloscheduler.so.4
check "so does the command line" needs bin/zelosched
check "the loader takes these" loads_them
check "it says its version" runs
check "it lists tasks" lists
check "and it cannot do without this platform" cannot_do_without
finish
