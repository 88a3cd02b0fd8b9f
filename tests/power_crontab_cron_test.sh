#!/bin/bash
# A real cron daemon takes a crontab that both backends have written. Runs in the sandbox.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"
# shellcheck source=tests/support/start_cron.sh
. "$here/support/start_cron.sh"

readonly LOG=/tmp/power_crontab_cron_test.log
readonly CRONTAB=/tmp/power_crontab_cron_test.crontab
readonly POWER_OFF=/usr/zelo/bin/zelo_poweroff_feasible_check

# In place of start_cron's own: the crontab is the one under test.
replace_machine_jobs() {
  rm -rf /etc/cron.*
  mkdir /etc/cron.d
  install -m 0644 -o root -g root "$CRONTAB" /etc/crontab
  touch -d '1 hour ago' /etc/crontab /etc/cron.d /var/spool/cron/crontabs
}

write_both() {
  "$BUILD_DIR/tests/power_crontab_side_by_side_test" >/tmp/side_by_side.out 2>&1 ||
    { cat /tmp/side_by_side.out; return 1; }
  cp /etc/crontab "$CRONTAB"
}

has_lines_of() {
  (($(grep -c "$1" "$CRONTAB") > 5))
}

log_says() {
  grep -iE 'error|bad|wrong|fail' "$LOG" || { cat "$LOG"; return 1; }
}

log_is_clean() {
  ! grep -iE 'error|bad|wrong|fail' "$LOG"
}

stop_cron() {
  kill "$!"
  wait "$!" || true
  rm -f /var/run/crond.pid
}

check "both backends have written the crontab" write_both
check "it has lines of ordinary tasks" has_lines_of /tmp/zeloschedtask
check "it has lines of power-off times" has_lines_of "$POWER_OFF"
check "cron takes the whole crontab" start_cron "$LOG"
check "and finds no error in it" log_is_clean
stop_cron
printf '5\t22\t*\t*\t\troot\t%s\n' "$POWER_OFF" >>"$CRONTAB"
check "cron takes a crontab with a line without weekdays" start_cron "$LOG"
check "and would have told of it" log_says
finish
