#!/bin/bash
# What "cmake --install" leaves: files where callers look for them, and examples that are built
# against nothing else, in C by pkg-config and in C++ by find_package, and do what they say.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"

readonly EXAMPLES=$here/../examples
readonly PREFIX=/tmp/install_test/prefix
readonly BIN=/tmp/install_test/bin
multiarch=$(gcc -print-multiarch)
export LC_ALL=C
mkdir -p "$BIN"

install_all() {
  cmake --install "$BUILD_DIR" --prefix "$PREFIX" >/tmp/install_test/log 2>&1 ||
    { cat /tmp/install_test/log; return 1; }
}

installed_outside() {
  grep -v "^$PREFIX/" "$BUILD_DIR/install_manifest.txt" || true
}

# Man pages are counted by their own test.
installed_files() {
  (cd "$PREFIX" && find . -type f -o -type l) | sed 's|^\./||' | grep -v '^share/man/' | sort
}

expected_files() {
  sed "s|LIB|$lib|" <<'FILES' | sort
LIB/cmake/zeloscheduler/zeloscheduler-config-version.cmake
LIB/cmake/zeloscheduler/zeloscheduler-config.cmake
LIB/cmake/zeloscheduler/zeloscheduler-targets-relwithdebinfo.cmake
LIB/cmake/zeloscheduler/zeloscheduler-targets.cmake
LIB/libzelocore.so
LIB/libzelosdk.so
LIB/libzeloscheduler.so
LIB/libzeloscheduler.so.4
LIB/pkgconfig/zeloscheduler.pc
include/zelocore.h
include/zelosched.h
include/zeloschedgetter.h
include/zeloschedsetter.h
include/zelosdk.h
libexec/zelosched/zelo_poweroff_feasible_check
sbin/zelosched
sbin/zeloschedtask
share/bash-completion/completions/zelosched
FILES
}

nothing_leads_out() {
  ! grep -rlE "$here/\.\.|$(cd "$here/.." && pwd -P)/|$BUILD_DIR" "$PREFIX/include" \
    "$PREFIX/$lib/cmake" "$PREFIX/$lib/pkgconfig"
}

has_no_run_path() {
  ! readelf -d "$PREFIX/$1" | grep -E 'RPATH|RUNPATH'
}

# As a Debian package is built.
configure_for_debian() {
  cmake -S "$here/.." -B /tmp/install_test/debian -DCMAKE_INSTALL_PREFIX=/usr -DZELO_TESTS=OFF \
    >/tmp/install_test/log 2>&1 || { cat /tmp/install_test/log; return 1; }
}

debian_directory() {
  sed -n "s/^CMAKE_INSTALL_$1:PATH=//p" /tmp/install_test/debian/CMakeCache.txt
}

flags() {
  PKG_CONFIG_PATH=$PREFIX/$lib/pkgconfig pkg-config "$@"
}

build_by_pkg_config() {
  local name=$1
  shift
  # shellcheck disable=SC2046
  gcc -std=c11 -D_POSIX_C_SOURCE=200809L -Wall -Wextra -pedantic -Werror "$EXAMPLES/$name.c" \
    $(flags --cflags --libs zeloscheduler "$@") -o "$BIN/$name"
}

build_by_cmake() {
  { cmake -S "$EXAMPLES" -B /tmp/install_test/examples -DCMAKE_PREFIX_PATH="$PREFIX" &&
    cmake --build /tmp/install_test/examples; } >/tmp/install_test/log 2>&1 ||
    { cat /tmp/install_test/log; return 1; }
}

with_library() {
  LD_LIBRARY_PATH=$PREFIX/$lib "$@"
}

output_is() {
  local wanted=$1
  shift
  same "$(with_library "$@")" "$wanted"
}

fails_as_usage() {
  local status=0
  with_library "$@" >/dev/null 2>&1 || status=$?
  same "$status" 2
}

json_names() {
  with_library python3 "$EXAMPLES/tasks_as_json.py" |
    python3 -c 'import json, sys
print(sorted(json.loads(line)["name"] for line in sys.stdin))'
}

failed_run() {
  local status=0 text
  text=$(with_library "$BIN/watch_run" "$1") || status=$?
  same "$text, $status" "$2, 1"
}

check "everything is installed into an empty prefix" install_all
check "nothing is installed outside of it" same "$(installed_outside)" ""
lib=$(cd "$PREFIX" && dirname "$(find . -name libzeloscheduler.so.4)" | sed 's|^\./||')
readonly lib
build_type=$(sed -n 's/^CMAKE_BUILD_TYPE:[A-Z]*=//p' "$BUILD_DIR/CMakeCache.txt")
check "the files are the library, the platform, headers, package files and tools" \
  same "$(installed_files)" "$(expected_files | sed "s/relwithdebinfo/${build_type,,}/")"
check "the name without a version leads to the library" \
  same "$(readlink "$PREFIX/$lib/libzeloscheduler.so")" libzeloscheduler.so.4
check "nothing that is installed names the checkout" nothing_leads_out
for file in "$lib/libzeloscheduler.so.4" "$lib/libzelosdk.so" sbin/zelosched sbin/zeloschedtask; do
  check "$(basename "$file") has no run path" has_no_run_path "$file"
done
check "the version is pkg-config's" same "$(flags --modversion zeloscheduler)" 4.0.0

check "it is configured for a Debian package" configure_for_debian
check "libraries go where Debian has them" same "$(debian_directory LIBDIR)" "lib/$multiarch"
check "pkg-config's file leads to /usr from there" \
  grep -qF "prefix=\${pcfiledir}/../../.." /tmp/install_test/debian/cmake/zeloscheduler.pc

if grep -q '^ZELO_SANITIZE:STRING=.' "$BUILD_DIR/CMakeCache.txt"; then
  skip "the examples are built and run" "the library has sanitizers"
  finish
fi
check "save_and_list is built by pkg-config" build_by_pkg_config save_and_list
check "tasks_of_owner is built by pkg-config" build_by_pkg_config tasks_of_owner
check "watch_run is built by pkg-config" build_by_pkg_config watch_run sqlite3
check "the C++ examples are built by find_package" build_by_cmake

check "a task is saved and listed" with_library "$BIN/save_and_list" good 'exit 0'
tomorrow_or_today='[0-9]{4}-[0-9]{2}-[0-9]{2} 02:30'
check "the list has the next trigger time" grep -qE "^2    bad +next run: $tomorrow_or_today$" \
  <(with_library "$BIN/save_and_list" bad 'exit 3')
check "a run that ends well is watched to its end" \
  output_is "task 1 finished" "$BIN/watch_run" 1
check "a run that fails is told with its exit code" failed_run 2 "task 2 failed with 3"
check "the filter passes the owner's tasks" \
  same "$(with_library "$BIN/tasks_of_owner" 0 | sort | tr '\n' ' ')" "1 good 2 bad 2 tasks "
check "the filter holds the others back" output_is "0 tasks" "$BIN/tasks_of_owner" 77
check "the C++ example lists in the order of names" \
  same "$(with_library /tmp/install_test/examples/next_runs | sed 's/:.*//' | tr '\n' ' ')" "bad good "
check "the Python example lists tasks as JSON" same "$(json_names)" "['bad', 'good']"
for name in save_and_list tasks_of_owner watch_run; do
  check "$name without arguments tells its usage" fails_as_usage "$BIN/$name"
done
finish
