#!/bin/bash
# What can be found without running anything.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"

cd "$here/.."
# Here-strings, as a chroot without /proc has no /dev/fd.
mapfile -t units <<<"$(find libzeloscheduler platform tools -name '*.cpp' | sort)"
mapfile -t formatted <<<"$(find libzeloscheduler platform tools tests bench examples fuzz \
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

# Its parser knows no __VA_OPT__, which the library's report macros are made of.
cpp_check() {
  cppcheck --enable=warning,performance,portability --inline-suppr --quiet --error-exitcode=1 \
    --std=c++20 --language=c++ --suppress=missingIncludeSystem -I platform/libzelocore \
    -I platform/libzelocore/include -I platform/libzelosdk/include platform tools
}

if have shellcheck "scripts are checked"; then
  check "scripts are checked" shellcheck -x "${scripts[@]}"
fi
if have clang-format "sources are formatted"; then
  check "sources are formatted" clang-format --dry-run --Werror "${formatted[@]}"
fi
if have cppcheck "platform and tools are checked by cppcheck"; then
  check "platform and tools are checked by cppcheck" cpp_check
fi
if have clang-tidy "every unit is checked by clang-tidy"; then
  for unit in "${units[@]}"; do check "clang-tidy: $unit" tidy "$unit"; done
fi
finish
