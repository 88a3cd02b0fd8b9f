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

page() {
  (cd "$here/../web" && printf 'share/cockpit/zelosched/%s\n' ./*.js index.html manifest.json style.css po.de.js) | sed 's|/\./|/|'
}

expected_files() {
  { page && sed "s|LIB|$lib|"; } <<'FILES' | sort
LIB/cmake/zeloscheduler/zeloscheduler-config-version.cmake
LIB/cmake/zeloscheduler/zeloscheduler-config.cmake
LIB/cmake/zeloscheduler/zeloscheduler-targets-relwithdebinfo.cmake
LIB/cmake/zeloscheduler/zeloscheduler-targets.cmake
LIB/libzelocore.so
LIB/libzelosdk.so
LIB/libzeloscheduler.so
LIB/libzeloscheduler.so.4
LIB/pkgconfig/zeloscheduler.pc
LIB/zeloscheduler/take-names
include/zelocore.h
include/zelosched.h
include/zeloschedgetter.h
include/zeloschedsetter.h
include/zelosdk.h
libexec/zelosched/zelo_poweroff_feasible_check
sbin/zelosched
sbin/zeloschedtask
share/bash-completion/completions/zelosched
share/fish/vendor_completions.d/zelosched.fish
share/metainfo/cockpit-zelosched.metainfo.xml
share/zelosched/mail-on-failure
share/zelosched/zelosched-1.schema.json
share/zelosched/zelosched.rules.yml
share/zeloscheduler/take_lines_out
share/zeloscheduler/zeloschedtask.stand-in
share/zsh/vendor-completions/_zelosched
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

readonly -a new_task=(owner=65534 name=n cmd=true 'run hour=1' 'run min=2')

# Owner, name, command, hour and minute of a stored task.
stored_fields() {
  with_library "$PREFIX/sbin/zelosched" show "$1" --json | python3 -c 'import json, sys
task = json.load(sys.stdin)["tasks"][0]
print(*(task[key] for key in ("owner_uid", "name", "command")), *(int(part) for part in task["schedule"]["at"].split(":")))'
}

# refused UID PAIR...: with status 1, and nothing stored is another one than before
refused() {
  local before status=0
  before=$(cat /tmp/scheduled_tasks /etc/crontab)
  with_library "$BIN/save_for_user" "$@" >/dev/null 2>&1 || status=$?
  [[ $status == 1 && $(cat /tmp/scheduled_tasks /etc/crontab) == "$before" ]] ||
    { echo "status $status: $*"; return 1; }
}

refuses_every_other_owner() {
  local owner bad=0
  for owner in '' 0 ' 0' -0 +0 00 0x0 ' ' 1000 065534 ' 65534' '65534 ' 65534.0 4295032830 -1 nobody; do
    refused 65534 "owner=$owner" "${new_task[@]:1}" || bad=1
  done
  refused 65534 "${new_task[@]:1}" || bad=1
  refused 65534 owner=0 "${new_task[@]}" || bad=1
  refused 65534 "${new_task[@]}" owner=0 || bad=1
  refused 65534 "${new_task[@]}" owner=65534 || bad=1
  refused 65534 "${new_task[@]}" Owner=0 || bad=1
  return "$bad"
}

# The first is root's, and its name and app are what everybody can read.
refuses_the_tasks_of_others() {
  local id bad=0
  for id in 1 2 01 ' 1' -0 +1 1x '' 4294967297 99 71270730; do
    refused 65534 "id=$id" "${new_task[@]}" || bad=1
  done
  refused 65534 owner=65534 id=1 name=good || bad=1
  refused 65534 owner=65534 id=3 id=1 name=good || bad=1
  refused 1000 owner=1000 id=3 name=mine || bad=1
  same "$(stored_fields 1)" "0 good exit 0 2 30" && return "$bad"
}

has_no_more_than_fifty() {
  while [[ $(with_library "$BIN/tasks_of_owner" 65534 | tail -1) != "50 tasks" ]]; do
    with_library "$BIN/save_for_user" 65534 "${new_task[@]}" >/dev/null || return 1
  done
  refused 65534 "${new_task[@]}" &&
    output_is "saved as task 3" "$BIN/save_for_user" 65534 owner=65534 id=3 'run hour=22'
}

refuses_bad_fields() {
  local pair bad=0
  for pair in 'run hour=24' 'run hour=-1' 'run hour=' 'run hour= 1' 'run min=60' 'run min=4294967297' \
    "cmd=$(printf %012288d 0)" "name=$(printf %04096d 0)" app=x state=enabled '' = 'run hour' =1; do
    refused 65534 owner=65534 id=3 "$pair" || { echo "taken: ${pair:0:40}"; bad=1; }
  done
  for pair in name cmd 'run hour' 'run min'; do
    local rest=() given
    for given in "${new_task[@]}"; do
      if [[ $given != "$pair="* ]]; then rest+=("$given"); fi
    done
    refused 65534 "${rest[@]}" || { echo "a new task without $pair"; bad=1; }
  done
  return "$bad"
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
check "save_for_user is built by pkg-config" build_by_pkg_config save_for_user
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
check "a task is saved for a user" output_is "saved as task 3" \
  "$BIN/save_for_user" 65534 "${new_task[@]}"
check "and is his" output_is "3 n
1 tasks" "$BIN/tasks_of_owner" 65534
check "he changes a field of his task" output_is "saved as task 3" \
  "$BIN/save_for_user" 65534 owner=65534 id=3 'run hour=23'
check "that field alone" same "$(stored_fields 3)" "65534 n true 23 2"
check "every other owner than his plain number is refused" refuses_every_other_owner
check "a task of another owner is not taken over" refuses_the_tasks_of_others
check "what cron could not read is refused, and what is no field of his" refuses_bad_fields
check "he has no more than fifty tasks" has_no_more_than_fifty
for name in save_and_list save_for_user tasks_of_owner watch_run; do
  check "$name without arguments tells its usage" fails_as_usage "$BIN/$name"
done
finish
