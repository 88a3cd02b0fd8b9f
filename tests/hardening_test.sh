#!/bin/bash
# The protections that the built files carry. A build for the sanitizers, or one without
# ZELO_HARDEN, has others.
#
# Functions are called by check, and awk expands what is in quotes:
# shellcheck disable=SC2317,SC2016
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

# An empty element is the current directory, and whoever owns that would choose the libraries.
has_no_empty_run_path() {
  ! readelf -dW "$1" | sed -n 's/.*(R\(UN\)\{0,1\}PATH).*\[\(.*\)\]$/:\2:/p' | grep '::' >/dev/null
}

is_program_or_library() {
  [[ $(head -c 4 "$1") == $'\x7fELF' && $(od -An -j16 -N2 -td2 "$1") -ne 1 ]]
}

run_paths_have_no_empty_element() {
  local file count=0 bad=0
  while IFS= read -r -d '' file; do
    is_program_or_library "$file" || continue
    ((++count))
    has_no_empty_run_path "$file" || { echo "$file"; bad=1; }
  done < <(find "$BUILD_DIR" -type f ! -name '*.o' ! -name '*.a' ! -name '*.gch' \
    \( -perm /111 -o -name '*.so*' \) -print0)
  echo "$count files"
  ((bad == 0 && count >= ${#LIBRARIES[@]} + ${#TOOLS[@]}))
}

is_position_independent() {
  readelf -hW "$1" | grep -E 'Type: +DYN' >/dev/null && readelf -dW "$1" | grep -E 'FLAGS_1.* PIE' >/dev/null
}

calls() {
  readelf -sW --dyn-syms "$1" | grep -E "UND $2(@|$)" >/dev/null
}

is_among() {
  local name=$1
  shift
  [[ " $* " == *" $name "* ]]
}

# Whether each unit under a directory was. A test that has a unit of the library of its own is no part
# of what is installed.
readonly COMMANDS='
  /"directory":/ { is_test = $0 ~ /\/(tests|fuzz|bench)"/ }
  /"command":/ && !is_test && $0 ~ directory { units++; if (index($0, " " option " ") == 0) without++ }
  END { exit !(units > 0 && without == 0) }'
is_compiled_with() {
  awk -v option="$1" -v directory=" -c [^ ]*/$2/[^ ]*[.]c" "$COMMANDS" \
    "$BUILD_DIR/compile_commands.json"
}

if [[ $(setting ZELO_HARDEN) != ON || -n $(setting ZELO_SANITIZE) ]]; then
  skip "the built files are protected" "this build leaves that to the sanitizers or to nobody"
  finish
fi

readonly LIBRARIES=("$BUILD_DIR"/lib/lib{zelocore,zeloscheduler,zelosdk}.so)
readonly TOOLS=("$BUILD_DIR"/bin/zelosched* "$BUILD_DIR/bin/take-names")
readonly SOURCES=(schedule libzeloscheduler platform tools)
# These cannot show it, as nothing in them needs it: no function with an array, no call that writes
# into a buffer or by a format. What they were compiled with is looked at below.
readonly WITHOUT_ARRAYS=(zeloschedtask)
readonly WITHOUT_BUFFERS=(libzelosdk.so)
readonly FORTIFIED='__[a-z]+_chk'

is_optimised=true
if [[ $(setting CMAKE_BUILD_TYPE) == Debug ]]; then is_optimised=false; fi

check "all libraries and tools are there" test "${#LIBRARIES[@]} ${#TOOLS[@]}" = "3 3"
for file in "${LIBRARIES[@]}" "${TOOLS[@]}"; do
  name=$(basename "$file")
  check "$name: what was relocated is read-only" relocations_are_read_only "$file"
  check "$name: every name is bound at the start" binds_at_start "$file"
  check "$name: the stack is not executable" stack_is_not_executable "$file"
  check "$name: no code is written to" has_no_text_relocations "$file"
  if ! is_among "$name" "${WITHOUT_ARRAYS[@]}"; then
    check "$name: stacks are guarded" calls "$file" __stack_chk_fail
  fi
  if $is_optimised && ! is_among "$name" "${WITHOUT_BUFFERS[@]}"; then
    check "$name: calls that write into a buffer know its size" calls "$file" "$FORTIFIED"
  fi
done
check "no run path has an empty element" run_paths_have_no_empty_element
for file in "${TOOLS[@]}"; do
  check "$(basename "$file") can be loaded anywhere" is_position_independent "$file"
done
for directory in "${SOURCES[@]}"; do
  check "$directory: every unit has its stacks guarded" \
    is_compiled_with -fstack-protector-strong "$directory"
  check "$directory: every unit has its stacks probed" \
    is_compiled_with -fstack-clash-protection "$directory"
  if $is_optimised; then
    check "$directory: every unit knows the sizes of buffers" \
      is_compiled_with -D_FORTIFY_SOURCE=2 "$directory"
  fi
done
finish
