#!/bin/bash
# The administrator's program as somebody at a terminal sees it.
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/have_terminals.sh
. "$here/support/have_terminals.sh"
export TZ=UTC
exec python3 "$here/support/zelosched_terminal.py"
