#!/bin/bash
# The protections that the built files carry. A build for the sanitizers, or one without
# ZELO_HARDEN, has others.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"

setting() {
  sed -n "s/^$1:[A-Z]*=//p" "$BUILD_DIR/CMakeCache.txt"
}

relocations_are_read_only() {
  readelf -lW "$1" | grep GNU_RELRO >/dev/null
}

binds_at_start() {
  readelf -dW "$1" | grep -E 'BIND_NOW|FLAGS_1.* NOW' >/dev/null
}

stack_is_not_executable() {
  readelf -lW "$1" | grep -E '^ *GNU_STACK .* RW +0x' >/dev/null
}

has_no_text_relocations() {
  ! readelf -dW "$1" | grep TEXTREL >/dev/null
}

is_position_independent() {
  readelf -hW "$1" | grep -E 'Type: +DYN' >/dev/null && readelf -dW "$1" | grep -E 'FLAGS_1.* PIE' >/dev/null
}

calls() {
  readelf -sW --dyn-syms "$1" | grep -E "UND $2(@|$)" >/dev/null
}

if [[ $(setting ZELO_HARDEN) != ON || -n $(setting ZELO_SANITIZE) ]]; then
  skip "the built files are protected" "this build leaves that to the sanitizers or to nobody"
  finish
fi

readonly LIBRARIES=("$BUILD_DIR"/lib/lib*.so)
readonly TOOLS=("$BUILD_DIR"/bin/zeloschedt*)
for file in "${LIBRARIES[@]}" "${TOOLS[@]}"; do
  name=$(basename "$file")
  check "$name: what was relocated is read-only" relocations_are_read_only "$file"
  check "$name: every name is bound at the start" binds_at_start "$file"
  check "$name: the stack is not executable" stack_is_not_executable "$file"
  check "$name: no code is written to" has_no_text_relocations "$file"
done
for file in "${LIBRARIES[@]}"; do
  check "$(basename "$file"): stacks are guarded" calls "$file" __stack_chk_fail
done
for file in "${TOOLS[@]}"; do
  check "$(basename "$file") can be loaded anywhere" is_position_independent "$file"
done
if [[ $(setting CMAKE_BUILD_TYPE) != Debug ]]; then
  check "calls that write into a buffer know its size" \
    calls "$BUILD_DIR/lib/libzeloscheduler.so" '__.*_chk'
fi
finish
