#!/bin/bash
# What leaves the library: the names of its map under their version, and headers that stand alone.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"
readonly SOURCE=$here/../libzeloscheduler
readonly LIBRARY=$BUILD_DIR/lib/libzeloscheduler.so
readonly VERSION_NODE=ZELOSCHED_4
export LC_ALL=C

# The names between "global:" and "local:", one a line.
names_in_map() {
  sed -n '/global:/,/local:/p' "$SOURCE/libzeloscheduler.map" | grep -oE '^ +[A-Za-z_]+;' |
    tr -d ' ;' | sort
}

names_in_library() {
  nm -D --defined-only "$LIBRARY" | awk '$2 != "A" { print $3 }' | sort
}

soname() {
  readelf -d "$LIBRARY" | sed -n 's/.*(SONAME).*\[\(.*\)\].*/\1/p'
}

kinds_of_globals() {
  nm -D --defined-only "$LIBRARY" | awk '$2 ~ /^[BD]$/ { print $3 }' | sort | tr '\n' ' '
}

compiles_alone() {
  local header=$1
  shift
  "$@" -Wall -Wextra -pedantic -Werror -I "$SOURCE/include" -fsyntax-only - \
    <<<"#include \"$header\""
}

# The handle types are named in both headers.
compiles_with_platform() {
  "$@" -Wall -Wextra -pedantic -Werror -I "$SOURCE/include" \
    -I "$here/../platform/libzelocore/include" -fsyntax-only - \
    <<<'#include "zelosched.h"
#include "zelocore.h"
#include "zelosched.h"'
}

check "the library exports the names of its map, each under $VERSION_NODE" \
  same "$(names_in_library)" "$(names_in_map | sed "s/\$/@@$VERSION_NODE/")"
check "the map has names" test "$(names_in_map | wc -l)" -ge 40
check "the globals are the three" same "$(kinds_of_globals)" \
  "SchedBackends@@$VERSION_NODE cBackend@@$VERSION_NODE pfLock@@$VERSION_NODE "
check "the library's name carries its version" same "$(soname)" libzeloscheduler.so.4
check "the library is there under its name" test -e "$LIBRARY.4"
for header in "$SOURCE"/include/*.h; do
  name=$(basename "$header")
  check "$name compiles alone as C11" compiles_alone "$name" gcc -std=c11 -x c
  check "$name compiles alone as C++17" compiles_alone "$name" g++ -std=c++17 -x c++
done
check "the header goes with the platform's as C11" compiles_with_platform gcc -std=c11 -x c
check "the header goes with the platform's as C++17" compiles_with_platform g++ -std=c++17 -x c++
finish
