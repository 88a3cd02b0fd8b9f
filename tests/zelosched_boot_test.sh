#!/bin/bash
# What the administrator's program does around a boot: it puts the tasks back into /tmp, keeps the
# history, and makes up for what was missed while the machine was off.
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"
# shellcheck source=tests/support/zelosched_test.sh
. "$here/support/zelosched_test.sh"

start_zelosched_tests
transcripts zelosched_restore.txt zelosched_history.txt zelosched_missed.txt zelosched_health.txt
finish
