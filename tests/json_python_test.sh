#!/bin/bash
# Tasks as JSON, read and written by another implementation of JSON: Python's.
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"

readonly PROGRAM=$BUILD_DIR/tests/json_tasks

check "1000 random tasks of any bytes are read by the double decoding" \
  python3 "$here/support/json_tasks.py" read "$PROGRAM" 1000
check "100 tasks that Python wrote are saved as they are" \
  python3 "$here/support/json_tasks.py" save "$PROGRAM" 100
finish
