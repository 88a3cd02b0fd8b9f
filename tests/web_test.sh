#!/bin/bash
# The page for Cockpit, in a real browser, served by a real cockpit-ws: stories of people who use it, each
# with what it must lead to, read back by zelosched. tests/support/web_stories.py has the stories, and
# web_machine.py what they stand on.
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"
# shellcheck source=tests/support/zelosched_test.sh
. "$here/support/zelosched_test.sh"

readonly PYTHON=/usr/bin/python3 # which has Debian's selenium

start_zelosched_tests
# The machine's own zone, which programs that cron starts have too.
unset TZ
ln -sf /usr/share/zoneinfo/Europe/Berlin /etc/localtime
check "the texts for translators are up to date, and German is complete" "$here/../scripts/web-po" --check
"$PYTHON" "$here/support/web_stories.py" "$@" || tests_failed=1
finish
