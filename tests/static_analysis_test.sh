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

# The arguments by which the units of zelosched are compiled, one after a null byte each.
arguments_of_zelosched() {
  python3 -c 'import json, shlex, sys
command = next(unit["command"] for unit in json.load(sys.stdin) if unit["file"].endswith("/zelosched/json/json_out.cpp"))
print("\0".join(shlex.split(command.split(" -o ")[0])[1:]), end="\0")' <"$BUILD_DIR/compile_commands.json"
}

# Most of a unit's time goes into what it includes, so some are looked at as one.
are_tidy_together() {
  printf '#include "%s"\n' "${@/#/$PWD/}" >"$scratch/together.cpp"
  clang-tidy --quiet --config="$(cat .clang-tidy)" --checks=-bugprone-suspicious-include "$scratch/together.cpp" -- \
    "${arguments[@]}" >/dev/null 2>&1
}

# Two units may have names in common, so only each by itself tells what is wrong with it. Whether a using
# declaration is needed is looked for in the file that clang-tidy is given, not in what this includes.
check_tidiness() {
  local unit
  if (($# > 1)) && ! grep -qE '^ *using [A-Za-z_:]+;' "$@" && are_tidy_together "$@"; then
    printf 'ok - clang-tidy: %s\n' "$@"
    return
  fi
  for unit in "$@"; do check "clang-tidy: $unit" tidy "$unit"; done
}

# Three at a time, of different folders where that can be, as these include the same and are named apart.
check_tidiness_of_zelosched() {
  local -a files arguments
  local i groups
  mapfile -t files <<<"$(printf '%s\n' "${units[@]}" | grep '^tools/zelosched/.*/')"
  arguments_of_zelosched >"$scratch/arguments" # no process substitution, which needs /proc
  mapfile -d '' arguments <"$scratch/arguments"
  groups=$(((${#files[@]} + 2) / 3))
  for ((i = 0; i < groups; i++)); do
    check_tidiness "${files[i]}" ${files[i + groups]:+"${files[i + groups]}"} \
      ${files[i + 2 * groups]:+"${files[i + 2 * groups]}"}
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
  for unit in "${units[@]}"; do
    if [[ $unit != tools/zelosched/*/* ]]; then check_tidiness "$unit"; fi
  done
  check_tidiness_of_zelosched
fi
rm -r "$scratch"
finish
