# shellcheck shell=bash
# For scripts that run in the sandbox: start_cron LOG starts Debian's cron daemon with its log in
# the file LOG, and returns when it has read the crontab. It ends with the sandbox.

: "${BUILD_DIR:?the build directory}"
readonly CRON_LOGS_STARTS_AND_FAILURES=5

# None of the machine's own jobs may run in here: they would work on what is not private, /var say.
# Cron looks at the times of these files to the second; being old, a change right now is noticed.
replace_machine_jobs() {
  rm -rf /etc/cron.*
  mkdir /etc/cron.d
  cat >/etc/crontab <<'CRONTAB'
# /etc/crontab: system-wide crontab
SHELL=/bin/sh
PATH=/usr/local/sbin:/usr/local/bin:/sbin:/bin:/usr/sbin:/usr/bin

17 *	* * *	root	true
CRONTAB
  chown root:root /etc/crontab
  chmod 0644 /etc/crontab
  touch -d '1 hour ago' /etc/crontab /etc/cron.d /var/spool/cron/crontabs
}

start_cron() {
  local log=$1 root="" tenths
  if [[ ! -x /usr/sbin/cron ]]; then
    root=$BUILD_DIR/cron
    install -m 0644 "$root/etc/pam.d/cron" /etc/pam.d/cron
  fi
  replace_machine_jobs
  : >"$log"
  LD_PRELOAD=$BUILD_DIR/tests/syslog_to_file.so SYSLOG_FILE=$log "$root/usr/sbin/cron" -f -L "$CRON_LOGS_STARTS_AND_FAILURES" &
  for ((tenths = 0; tenths < 50; tenths++)); do
    if grep -q reboot "$log" && [[ -s /var/run/crond.pid ]]; then return 0; fi
    sleep 0.1
  done
  echo "cron did not start" >&2
  return 1
}
