#!/bin/bash
# The manual pages as they are installed: well formed, one for each exported function by its name, and
# true in what a compiler can check, the prototypes and the examples.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"

readonly SCRATCH=/tmp/man_pages_test
readonly MAN=$SCRATCH/prefix/share/man
readonly HEADERS=(-I "$here/../libzeloscheduler/include" -I "$here/../platform/libzelocore/include")
readonly COMPILE=(gcc -std=c11 -Wall -Wextra -pedantic -Werror "${HEADERS[@]}")
export LC_ALL=C
mkdir -p "$SCRATCH"

install_pages() {
  cmake --install "$BUILD_DIR" --prefix "$SCRATCH/prefix" >"$SCRATCH/log" 2>&1 ||
    { cat "$SCRATCH/log"; return 1; }
}

# Pages that are not links to others.
pages() {
  grep -L '^\.so ' "$MAN"/man[3578]/*
}

exported_functions() {
  nm -D --defined-only "$BUILD_DIR/lib/libzeloscheduler.so.4" | awk '$2 == "T" { print $3 }' |
    sed 's/@.*//'
}

section_of_page() {
  awk -v wanted="$2" '/^\.SH /{ inside = ($0 == ".SH " wanted); next } inside' "$1"
}

are_well_formed() {
  local complaints
  complaints=$(pages | xargs mandoc -Tlint || true)
  same "$complaints" ""
}

have_sections() {
  local page section missing=0
  while read -r page; do
    for section in NAME SYNOPSIS DESCRIPTION "RETURN VALUE" ERRORS EXAMPLES "SEE ALSO"; do
      case $page:$section in
        *.8:"RETURN VALUE") section="EXIT STATUS" ;;
        *.8:ERRORS) continue ;; # they are in the exit status
        *.5:"RETURN VALUE" | *.5:ERRORS) continue ;; # of calls and programs
      esac
      [[ -n $(section_of_page "$page" "$section") ]] ||
        { echo "${page##*/} lacks $section"; missing=1; }
    done
  done < <(pages)
  return "$missing"
}

names_it() {
  section_of_page "$1" "$2" | grep -w "$3" >/dev/null
}

every_function_has_a_page() {
  local name page missing=0
  while read -r name; do
    page=$MAN/man3/$name.3
    if [[ ! -e $page ]]; then
      echo "$name has no page"
      missing=1
      continue
    fi
    page=$MAN/$(sed -n 's/^\.so //p' "$page")
    if ! names_it "$page" NAME "$name" || ! names_it "$page" SYNOPSIS "$name"; then
      echo "the page of $name does not name it"
      missing=1
    fi
  done < <(exported_functions)
  return "$missing"
}

every_page_is_of_a_function() {
  same "$(grep -l '^\.so ' "$MAN"/man3/* | sed 's|.*/||; s|\.3$||' | sort)" \
    "$(exported_functions | sort)"
}

is_shown_by_its_name() {
  (cd "$MAN" && mandoc -Tascii "man3/$1.3") | grep "$2" >/dev/null
}

man_finds() {
  same "$(man -M "$MAN" -w "$1")" "$2"
}

see_also_is_there() {
  local page name section missing=0
  while read -r page; do
    while read -r name section; do
      case $name in crontab | cron) continue ;; esac # Debian's
      [[ -e $MAN/man$section/$name.$section ]] ||
        { echo "${page##*/} refers to $name($section)"; missing=1; }
    done < <(section_of_page "$page" "SEE ALSO" | sed -n 's/^\.BR \([a-z_]*\) (\([0-9]\)).*/\1 \2/p')
  done < <(pages)
  return "$missing"
}

# A prototype that is not the header's conflicts with it.
synopsis_agrees_with_header() {
  section_of_page "$1" SYNOPSIS | sed -n 's/^\.B //p' | sed 's/^"//; s/"$//; s/\\-/-/g' |
    "${COMPILE[@]}" -x c -fsyntax-only -
}

# Each example that is a program, into a file of its own.
write_examples() {
  section_of_page "$1" EXAMPLES | sed 's/\\-/-/g; s/\\&//g; s/\\e/\\/g' |
    awk -v stem="$SCRATCH/$(basename "$1")" '
      /^\.EX$/ { inside = 1; count++; next }
      /^\.EE$/ { inside = 0; next }
      inside   { print >(stem "." count ".c") }'
  grep -L '^int main' "$SCRATCH/$(basename "$1")".*.c | xargs -r rm
}

examples_are_built() {
  local file
  write_examples "$1"
  for file in "$SCRATCH/$(basename "$1")".*.c; do
    "${COMPILE[@]}" "$file" -L "$BUILD_DIR/lib" -Wl,-rpath-link,"$BUILD_DIR/lib" -lzeloscheduler \
      -lzelocore -lsqlite3 -o "$SCRATCH/example" || return 1
  done
}

check "the pages are installed" install_pages
check "every page is well formed" are_well_formed
check "every page has its sections" have_sections
check "every exported function has a page of its name" every_function_has_a_page
check "there is no page of a function that is not exported" every_page_is_of_a_function
check "a function's page is shown by its name" \
  is_shown_by_its_name ZELOSchedTaskSave 'Nightly backup'
if command -v man >/dev/null; then
  check "man finds a function by its name" \
    man_finds ZELOSchedTaskSave "$MAN/man3/zelosched_task.3"
else
  skip "man finds a function by its name" "man is not installed"
fi
check "what the pages refer to is there" see_also_is_there
while read -r page; do
  case $page in *.[58]) continue ;; esac
  check "the prototypes of ${page##*/} are the header's" synopsis_agrees_with_header "$page"
  if grep -q '^ZELO_SANITIZE:STRING=.' "$BUILD_DIR/CMakeCache.txt"; then
    skip "the examples of ${page##*/} are built" "the library has sanitizers"
  else
    check "the examples of ${page##*/} are built" examples_are_built "$page"
  fi
done < <(pages)
finish
