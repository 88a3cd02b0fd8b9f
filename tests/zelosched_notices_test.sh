#!/bin/bash
# Notices of the end of a run: the programs in run-ended.d, mail to the owner, the system log.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"

# shellcheck source=tests/support/zelosched_test.sh
. "$here/support/zelosched_test.sh"

readonly TOLD=/etc/zelosched/run-ended.d
MAILER=$here/../packaging/mail-on-failure
cp /etc/crontab "$SCRATCH/crontab"

clean() {
  rm -rf /tmp/scheduled_tasks* /usr/zelo/etc/scheduled_tasks* "$STATUS"* /tmp/lock /usr/zelo/var /run/zelosched
  rm -rf /etc/zelosched /etc/default/zelosched-mail "$SCRATCH"/told* "$SCRATCH"/mail*
  cp "$SCRATCH/crontab" /etc/crontab
  mkdir -p "$TOLD"
}

# program NAME: what it does is read from standard input.
program() {
  { echo '#!/bin/sh'; cat; } >"$TOLD/$1"
  chmod 0755 "$TOLD/$1"
}

add() {
  local command=$1
  shift
  z add --quiet --daily 08:30 "$@" -- "$command" >/dev/null
}

# Runs tasks, and waits until no keeper is left.
run() {
  z run --wait "$@" >/dev/null 2>&1 || true
  wait_for_keepers
}

# Only status 1 of pgrep says that there is none; others are failures of pgrep.
wait_for_keepers() {
  local i status
  for ((i = 0; i < 1800; i++)); do
    status=0
    pgrep -x zeloschedtask >/dev/null || status=$?
    ((status != 1)) || return 0
    sleep 0.05
  done
  echo "a run is still looked after: $(pgrep -a zeloschedtask)"
  return 1
}

told_is() {
  same "$(cat "$SCRATCH"/told 2>/dev/null || true)" "$1"
}

gives_the_record() {
  clean
  add 'echo said; exit 3' --name 'nightly backup' --owner nobody --app backup
  program all <<TELL
echo "\$ZELO_RUN \$ZELO_RUN_TASK \$ZELO_RUN_TASK_NAME \$ZELO_RUN_APP \$ZELO_RUN_OWNER \$ZELO_RUN_TRIGGER \$ZELO_RUN_OUTCOME \$ZELO_RUN_EXIT_CODE -\$ZELO_RUN_SIGNAL- \$ZELO_RUN_OUTPUT_BYTES" >>$SCRATCH/told
stat -c '%a %U' "\$ZELO_RUN_OUTPUT" >>$SCRATCH/told
cat "\$ZELO_RUN_OUTPUT" >>$SCRATCH/told
TELL
  run 1
  told_is "1 1 nightly backup backup nobody manual failed 3 -- 5
600 root
said" && same "$(find /run/zelosched -name 'told.*' | wc -l)" 0
}

tells_in_the_order_of_names() {
  clean
  add true
  local name
  for name in 20-b 10-a 30-c; do program "$name" <<<"echo $name >>$SCRATCH/told"; done
  chmod a-x "$TOLD/30-c"
  program 40-d~ <<<"echo backup file >>$SCRATCH/told"
  run 1
  told_is $'10-a\n20-b'
}

runs_roots_programs_alone() {
  clean
  add true
  program shared <<<"echo shared >>$SCRATCH/told"
  program others <<<"echo others >>$SCRATCH/told"
  program own <<<"echo own >>$SCRATCH/told"
  chmod 0775 "$TOLD/shared"
  chown 65534 "$TOLD/others"
  run 1
  told_is own || return 1
  chmod 0777 "$TOLD"
  run 1
  told_is own
}

tells_of_the_first_success_after_a_failure() {
  clean
  add "test -e $SCRATCH/told.well"
  program all <<<"echo \$ZELO_RUN_OUTCOME -\$ZELO_RUN_RECOVERED- >>$SCRATCH/told"
  run 1
  : >"$SCRATCH/told.well"
  run 1
  run 1
  told_is "failed --
finished -1-
finished --"
}

# A child of the command keeps the pipe open; the keeper runs the programs all the same.
does_not_wait_for_the_pipe() {
  clean
  add "sleep 1000 & echo \$! >$SCRATCH/told.pid"
  program all <<<"echo told >>$SCRATCH/told"
  z run --wait 1 >/dev/null
  local i
  for ((i = 0; i < 1200; i++)); do [[ ! -s $SCRATCH/told ]] || break; sleep 0.05; done
  told_is told && kill "$(cat "$SCRATCH/told.pid")" && wait_for_keepers
}

# With its process group. The clock of the wait is the real one, so this takes half a minute.
ends_a_program_that_hangs() {
  clean
  add true
  program a <<<"sleep 1000 & echo \$! >$SCRATCH/told.pid; sleep 1000"
  program b <<<"echo told >>$SCRATCH/told"
  run 1 && told_is told && ! kill -0 "$(cat "$SCRATCH/told.pid")" 2>/dev/null
}

tells_of_lost_runs_once() {
  clean
  add true
  program all <<<"echo \$ZELO_RUN_OUTCOME \$ZELO_RUN_TRIGGER >>$SCRATCH/told"
  run 1
  sqlite3 "$STATUS" "INSERT INTO task_status VALUES(NULL, 4194305, 1795161600, '', 1, 2, '')"
  z history --keep >/dev/null
  z history --keep
  told_is $'finished manual\nlost other'
}

logs_one_line() {
  clean
  add 'exit 3' --name backup
  add true --name good
  SYSLOG_FILE=$SCRATCH/told.log LD_PRELOAD=$BUILD_DIR/tests/syslog_to_file.so z run --wait 1 >/dev/null 2>&1 || true
  SYSLOG_FILE=$SCRATCH/told.log LD_PRELOAD=$BUILD_DIR/tests/syslog_to_file.so z run --wait 2 >/dev/null
  same "$(sed 's/[0-9.]* s$/N s/' "$SCRATCH/told.log")" "task 1 (backup) of root: failed with exit code 3 after N s
task 2 (good) of root: finished after N s"
}

check "a program gets the record, and the output in root's file" gives_the_record
check "programs are run in the order of their names" tells_in_the_order_of_names
check "and those of root alone" runs_roots_programs_alone
check "the first success after a failure is told as such" tells_of_the_first_success_after_a_failure
check "who holds the pipe is not waited for" does_not_wait_for_the_pipe
check "a program that hangs is ended with its group" ends_a_program_that_hangs
check "a run that was lost is told once" tells_of_lost_runs_once
check "the system log has a line for each end" logs_one_line

# ---- mail -----------------------------------------------------------------------------------

# Keeps the mails that it gets.
put_sendmail() {
  clean
  cat >/usr/sbin/sendmail <<SENDMAIL
#!/bin/sh
printf '%s\n' "\$@" >"\$(mktemp $SCRATCH/mail_to.XXXXXX)"
cat >"\$(mktemp $SCRATCH/mail.XXXXXX)"
SENDMAIL
  chmod 0755 /usr/sbin/sendmail
  cp "$MAILER" "$TOLD/mail-on-failure"
}

mails() {
  find "$SCRATCH" -name 'mail.*' | wc -l
}

# What a mail program shows: the subject, and the text.
shown() {
  python3 -c 'import email.policy, sys
mail = email.message_from_binary_file(open(sys.argv[1], "rb"), policy=email.policy.default)
print(mail["To"], "|", mail["Subject"].split("] ", 1)[1], "|", len(mail.keys()))
print(mail.get_content().split("\n\n", 1)[1], end="")' "$SCRATCH"/mail.*
}

mails_the_owner() {
  put_sendmail
  add 'printf "caf\303\251\n.\n\001"; exit 3' --name 'größe' --owner nobody
  run 1
  same "$(cat "$SCRATCH"/mail_to.*)" $'-i\n--\nnobody' &&
    same "$(shown | tr '\001' '^')" "nobody | scheduled task 1 (größe) failed with exit code 3 | 6
It printed 9 bytes:

café
.
^"
}

mails_a_fixed_address() {
  put_sendmail
  echo 'MAIL_TO=admin@example.org' >/etc/default/zelosched-mail
  add 'exit 3' --owner nobody
  run 1
  same "$(tail -1 "$SCRATCH"/mail_to.*)" admin@example.org
}

# Makes the last mails an hour old.
an_hour_later() {
  sed -i "s/^[0-9]*/$(($(date +%s) - 3601))/" /run/zelosched/mailed/*
}

not_again_within_an_hour() {
  put_sendmail
  add 'exit 3'
  add 'exit 3' --name other
  run 1
  run 1
  same "$(mails)" 1 || return 1
  run 2
  same "$(mails)" 2 || return 1
  an_hour_later
  run 1
  same "$(mails)" 3
}

mails_no_success_but_the_first_again() {
  put_sendmail
  add "test -e $SCRATCH/told.well"
  run 1
  : >"$SCRATCH/told.well"
  run 1
  same "$(mails)" 1 || return 1
  an_hour_later
  run 1
  run 1
  same "$(mails)" 2
}

# In words of at most 75 bytes, none of which ends within a character.
long_names_stay_whole() {
  put_sendmail
  local name
  name=$(printf 'größe€%.0s' {1..20})
  add 'exit 3' --name "$name"
  run 1
  same "$(shown | sed -n 1p)" "root | scheduled task 1 ($name) failed with exit code 3 | 6" || return 1
  python3 -c 'import base64, re, sys
for word in re.findall(rb"=\?UTF-8\?B\?.*?\?=", open(sys.argv[1], "rb").read()):
    assert len(word) <= 75, word
    base64.b64decode(word[10:-2]).decode()' "$SCRATCH"/mail.*
}

says_what_became_of_it() {
  put_sendmail
  add 'kill -9 $$'
  add 'exec sleep 100' --time-limit 1s
  run 1
  same "$(shown | sed -n 1p)" "root | scheduled task 1 (Task 1) killed by signal 9 | 6" || return 1
  rm "$SCRATCH"/mail.*
  run 2
  same "$(shown | sed -n 1p)" "root | scheduled task 2 (Task 2) ended by its time limit | 6"
}

# Without a run, most variables are empty.
says_what_was_missed() {
  put_sendmail
  env ZELO_RUN='' ZELO_RUN_TASK=4 ZELO_RUN_TASK_NAME=backup ZELO_RUN_OWNER=root ZELO_RUN_OUTCOME=missed \
    ZELO_RUN_DUE=2026-11-20T02:30:00+01:00 ZELO_RUN_START='' ZELO_RUN_END='' ZELO_RUN_OUTPUT='' \
    ZELO_RUN_OUTPUT_BYTES=0 "$MAILER"
  same "$(shown)" "root | scheduled task 4 (backup) was not started when it was due | 6
\"zelosched status\" on this machine tells why, where that is known." &&
    same "$(sed '1,/^$/d' "$SCRATCH"/mail.* | base64 -d | sed '/^$/,$d')" "Task:     4 (backup)
Owner:    root
Outcome:  was not started when it was due
Due:      2026-11-20T02:30:00+01:00"
}

# tell_of_failure NAME: as a keeper would
tell_of_failure() {
  env ZELO_RUN=1 ZELO_RUN_TASK=1 ZELO_RUN_TASK_NAME="$1" ZELO_RUN_OWNER=root ZELO_RUN_OUTCOME=failed \
    ZELO_RUN_EXIT_CODE=3 ZELO_RUN_DUE='' ZELO_RUN_START='' ZELO_RUN_END='' ZELO_RUN_OUTPUT='' \
    ZELO_RUN_OUTPUT_BYTES=0 "$MAILER"
}

what_is_no_character_is_left_out() {
  put_sendmail
  tell_of_failure "$(printf 'a\374\302\205b%.0s' {1..60})"
  awk 'length > 78 { print "long:", length; bad = 1 } END { exit bad }' "$SCRATCH"/mail.* &&
    shown | sed -n 1p | grep -qF "($(printf 'ab%.0s' {1..60}))"
}

takes_turns() {
  put_sendmail
  local i
  for i in 1 2 3 4 5; do tell_of_failure backup & done
  wait
  same "$(mails)" 1
}

no_name_becomes_a_header() {
  put_sendmail
  add 'exit 3'
  sed -i 's/^name=.*/name="x\\nBcc: all@example.org"/' /tmp/scheduled_tasks
  run 1
  same "$(mails)" 1 && ! grep -qi '^bcc' "$SCRATCH"/mail.*
}

# The machine's own /usr/sbin stays as it is.
mkdir -p /tmp/notices_sbin
cp -a /usr/sbin/. /tmp/notices_sbin/
mount -n --bind /tmp/notices_sbin /usr/sbin
check "a failure is mailed to the owner" mails_the_owner
check "or to a fixed address" mails_a_fixed_address
check "not again within an hour for the same task" not_again_within_an_hour
check "a success is mailed when it is the first again" mails_no_success_but_the_first_again
check "a long name stays whole, in words as a header wants them" long_names_stay_whole
check "how a run ended is said as elsewhere" says_what_became_of_it
check "of a missed time is said what is known" says_what_was_missed
check "what is no character is left out" what_is_no_character_is_left_out
check "several ends at once are one mail" takes_turns
check "no name becomes a header" no_name_becomes_a_header
finish
