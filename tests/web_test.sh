#!/bin/bash
# The page for Cockpit, in a real browser, served by a real cockpit-ws: stories of people who use it, each
# with what it must lead to, read back by zelosched. tests/support/web_stories.py has the stories, and
# web_machine.py what they stand on.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"
# shellcheck source=tests/support/zelosched_test.sh
. "$here/support/zelosched_test.sh"

readonly PYTHON=/usr/bin/python3 # which has Debian's selenium

# The page that the demonstration starts, in the sandbox of this test, which ends it too.
demonstration_starts() {
  local log=$SCRATCH/demo.log tenths address
  clean
  : >"$log"
  ZELO_DEMO_STAGE=page "$here/../scripts/demo" >"$log" 2>&1 &
  for ((tenths = 0; tenths < 300; tenths++)); do
    if grep -q '^the page is at' "$log"; then break; fi
    sleep 0.1
  done
  address=$(sed -n 's/^the page is at //p' "$log")
  "$PYTHON" -c 'import sys, urllib.request
print(b"main.js" in urllib.request.urlopen(sys.argv[1]).read())' "$address" >"$SCRATCH/out" 2>>"$log" || true
  local names
  names=$(names)
  same "$(cat "$SCRATCH/out") $names" "True Fetch Monthly Nightly PowerOff PowerOn Sync" || { cat "$log"; return 1; }
}

start_zelosched_tests
# The machine's zone is the one of /etc/localtime, for programs that cron starts too.
unset TZ
check "the texts for translators are up to date, and German is complete" "$here/../scripts/web-po" --check
"$PYTHON" "$here/support/web_stories.py" "$@" || tests_failed=1
if (($# == 0)); then check "the demonstration starts the page with some tasks" demonstration_starts; fi
finish
