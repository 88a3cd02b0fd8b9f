#!/bin/bash
# Each claim of SECURITY.md names the tests that show it. A test that is renamed or taken away takes
# its claim along. And zelosched, the page and the Ansible modules, three languages, escape the same characters.
#
# Functions are called by check, and backquotes are looked for:
# shellcheck disable=SC2317,SC2016
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"
cd "$here/.."

exists() {
  local suite=${1%.*} name=${1#*.}
  grep -qE "^TEST(_F|_P)?\($suite, $name\)" tests/*.cpp
}

# The page keeps tabs and line feeds, and the modules line feeds; they escape lone surrogates, which UTF-8 has not.
escape_the_same() {
  python3 -c 'import re
def escaped(path, begin, end):
    text = open(path, encoding="utf-8").read()
    text = text[text.index(begin):]
    code = r"(?:0x|\\+(?:[xuU]|u(?=\{)\{))([0-9A-Fa-f]+)\}?"
    found = set()
    for first, last in re.findall(code + "(?:(?:-|, )" + code + ")?", text[:text.index(end)]):
        found.update(range(int(first, 16), int(last or first, 16) + 1))
    return found
tool = escaped("tools/zelosched/terminal/text.cpp", "kUnsafe[]", ";")
page = escaped("web/text.js", "const UNSEEN", ";\n")
modules = escaped("ansible/plugins/module_utils/zelosched.py", "UNSAFE =", "\n\n")
assert len(tool) > 4000, len(tool)
assert page == tool - {9, 10}, sorted(page ^ (tool - {9, 10}))
assert modules == tool - {10} | set(range(0xD800, 0xE000)), sorted(modules ^ tool)[:20]'
}

tests=$(grep -oE '`[A-Z][A-Za-z]+\.[A-Z][A-Za-z0-9]+`' SECURITY.md | tr -d '`' | sort -u)
files=$(grep -oE '`(tests|fuzz|debian)/[a-z_.]+`' SECURITY.md | tr -d '`' | sort -u)
check "claims name tests" test "$(wc -l <<<"$tests")" -ge 20
for name in $tests; do
  check "$name is there" exists "$name"
done
for file in $files; do
  check "$file is there" test -e "$file"
done
check "zelosched, the page and the Ansible modules escape the same characters" escape_the_same
finish
