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

have() {
  command -v "$1" >/dev/null || { skip "$2" "$1 is not installed"; return 1; }
}

tidy() {
  clang-tidy -p "$BUILD_DIR" --quiet "$1" 2>/dev/null
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
  for unit in "${units[@]}"; do check "clang-tidy: $unit" tidy "$unit"; done
fi
finish
