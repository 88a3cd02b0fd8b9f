#!/bin/bash
# Static analysis: clang-tidy, cppcheck, clang-format, shellcheck.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"

cd "$here/.."
# Here-strings, as a chroot without /proc has no /dev/fd.
mapfile -t units <<<"$(find schedule libzeloscheduler platform tools -name '*.cpp' | sort)"
mapfile -t formatted <<<"$(find schedule libzeloscheduler platform tools tests bench examples fuzz \
  \( -name '*.cpp' -o -name '*.h' -o -name '*.c' \) -not -path 'fuzz/corpus/*' | sort)"
mapfile -t scripts <<<"$(grep -lrE --include='*.sh' '^#!/bin/(ba)?sh' tests packaging | sort
  find scripts .ci -type f | sort
  find debian -name '*.postinst' -o -name '*.p*rm' | sort)"

scratch=$(mktemp -d)

have() {
  command -v "$1" >/dev/null || { skip "$2" "$1 is not installed"; return 1; }
}

tidy() {
  clang-tidy -p "$BUILD_DIR" --quiet "$1" 2>/dev/null
}

# The arguments by which a unit is compiled, one after a null byte each.
arguments_of() {
  python3 -c 'import json, shlex, sys
unit = next(unit for unit in json.load(sys.stdin) if unit["file"] == sys.argv[1])
print("\0".join(shlex.split(unit["command"].split(" -o ")[0])[1:]), end="\0")' "$PWD/$1" <"$BUILD_DIR/compile_commands.json"
}

# Most of a unit's time goes into what it includes, so those of a folder are looked at as one. Whoever calls
# this looks at its status, so a step that fails would not end it by itself.
are_tidy_together() {
  local together=$scratch/${1%/*}/together.cpp
  local -a arguments
  # clang-tidy takes the settings above the file that it is given. No process substitution, which needs /proc.
  mkdir -p "${together%/*}" && cp --parents .clang-tidy tools/.clang-tidy "$scratch" &&
    arguments_of "$1" >"$scratch/arguments" && mapfile -d '' arguments <"$scratch/arguments" &&
    printf '#include "%s" // NOLINT(bugprone-suspicious-include)\n' "${@/#/$PWD/}" >"$together" &&
    clang-tidy --quiet "$together" -- "${arguments[@]}" >/dev/null 2>&1
}

# The analyzer, which is for the libraries, begins at functions that it has not met as another's callee, and so
# would look at fewer of them. Whether a using declaration is needed is looked for in the file that clang-tidy
# is given, not in what this includes.
stands_alone() {
  [[ $1 != tools/zelosched/*/* ]] || grep -qE '^ *using [A-Za-z_:]+;' "$1"
}

# In the scratch directory: a path of the product's, as faults are told of these alone.
finds_a_fault_in_two() {
  local bad=$scratch/tools/zelosched/bad.cpp
  mkdir -p "${bad%/*}"
  echo 'int Bad_name() { return 1; }' >"$bad"
  ! are_tidy_together tools/zelosched/terminal/number.cpp "../$(realpath --relative-to=.. "$bad")" &&
    are_tidy_together tools/zelosched/terminal/number.cpp tools/zelosched/terminal/text.cpp
}

# Only each unit by itself tells what is wrong with it.
check_tidiness() {
  local unit
  local -a together=() alone=()
  for unit in "$@"; do
    if stands_alone "$unit"; then alone+=("$unit"); else together+=("$unit"); fi
  done
  if ((${#together[@]} > 1)) && are_tidy_together "${together[@]}"; then
    printf 'ok - clang-tidy: %s\n' "${together[@]}"
    together=()
  fi
  for unit in "${together[@]}" "${alone[@]}"; do check "clang-tidy: $unit" tidy "$unit"; done
}

check_tidiness_of_folders() {
  local folder
  local -a in_folder
  for folder in $(printf '%s\n' "${units[@]%/*}" | sort -u); do
    mapfile -t in_folder <<<"$(printf '%s\n' "${units[@]}" | grep "^$folder/[^/]*$")"
    check_tidiness "${in_folder[@]}"
  done
}

cpp_check() {
  cppcheck --enable=warning,performance,portability --inline-suppr --quiet --error-exitcode=1 \
    --std=c++20 --language=c++ --suppress=missingIncludeSystem -I platform/libzelocore \
    -I platform/libzelocore/include -I platform/libzelosdk/include "$@"
}

# cppcheck's parser knows no __VA_OPT__, which the report macros use. It gets a copy of their header
# with the older spelling.
cpp_check_library() {
  local macros status=0
  macros=$(mktemp)
  sed -e 's/SCHED_REPORT_H/SCHED_REPORT_SHOWN_H/' -e 's/ __VA_OPT__(, ) __VA_ARGS__/, ##__VA_ARGS__/' \
    libzeloscheduler/sched_report.h >"$macros"
  cpp_check -I libzeloscheduler -I libzeloscheduler/include -DSCHED_REPORT_H --include="$macros" \
    libzeloscheduler || status=$?
  rm -f "$macros"
  return "$status"
}

if have shellcheck "scripts are checked"; then
  check "scripts are checked" shellcheck -x "${scripts[@]}"
fi
if have clang-format "sources are formatted"; then
  check "sources are formatted" clang-format --dry-run --Werror "${formatted[@]}"
fi
if have cppcheck "sources are checked by cppcheck"; then
  check "schedules, platform and tools are checked by cppcheck" cpp_check schedule platform tools
  check "libzeloscheduler is checked by cppcheck" cpp_check_library
fi
if have clang-tidy "every unit is checked by clang-tidy"; then
  check "clang-tidy finds a fault in units that it looks at as one" finds_a_fault_in_two
  check_tidiness_of_folders
fi
rm -r "$scratch"
finish
