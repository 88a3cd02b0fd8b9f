#!/bin/bash
# What scripts/sandbox promises. Run outside of it.
#
# Functions are called by check, and commands in single quotes are for the shell in the sandbox:
# shellcheck disable=SC2016,SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"
sandbox=$here/../scripts/sandbox

in_sandbox() {
  "$sandbox" bash -c "$1"
}

status_of() {
  local status=0
  "$@" >/dev/null 2>&1 || status=$?
  echo "$status"
}

# Everything of the machine that something in the sandbox could have reached.
machine_state() {
  ls -lan --time-style=full-iso /etc /usr 2>/dev/null
  cksum /etc/crontab /etc/passwd 2>/dev/null || true
  ls -d /tmp/sandbox_test_mark /run/sandbox_test_mark /usr/zelo 2>/dev/null || true
}

passes_on_status() {
  same "$(status_of "$sandbox" bash -c "exit $1")" "$1"
}

# In a clone nothing else is built.
demonstration_builds_what_it_uses() {
  local targets name names
  targets=" $(sed -n 's,^ *"$root/scripts/build" ,,p' "$here/../scripts/demo" | tr '\n' ' ') "
  names=$(grep -hoE 'BUILD_DIR/(bin|tests)/[a-z_]+' "$here/../scripts/demo" "$here/support/start_cron.sh")
  for name in ${names//BUILD_DIR\//}; do
    name=${name##*/}
    [[ $targets == *" $name "* ]] || { echo "$name is missing:$targets"; return 1; }
  done
}

leaves_machine_alone() {
  local before
  before=$(machine_state)
  in_sandbox 'touch /tmp/sandbox_test_mark /run/sandbox_test_mark /etc/mark /usr/zelo/etc/mark
              mkdir /usr/zelo/libexec; echo x >>/etc/crontab; rm /etc/passwd'
  same "$(machine_state)" "$before"
}

kills_what_is_left() {
  local mark=$BUILD_DIR/sandbox_test_mark
  rm -f "$mark"
  in_sandbox "(sleep 0.5; touch '$mark') & disown"
  sleep 1
  [[ ! -e $mark ]]
}

reaps_orphans() {
  # The orphan's parent ends at once; a zombie would stay in the list.
  in_sandbox 'bash -c "sleep 0.1 & echo \$! >/tmp/orphan; disown"
              for tenth in {1..100}; do
                [[ -e /proc/$(</tmp/orphan) ]] || exit 0
                sleep 0.1
              done
              exit 1'
}

keeps_checkout_below_tmp() {
  local checkout
  checkout=$(mktemp -d /tmp/sandbox_test.XXXXXX)
  mkdir "$checkout/scripts"
  cp "$sandbox" "$checkout/scripts/"
  local result=0
  (cd "$checkout" && BUILD_DIR='' scripts/sandbox bash -c \
    "touch written && [[ -e $checkout/scripts/sandbox && \$(ls /tmp) == ${checkout#/tmp/} ]]") || result=1
  [[ -e $checkout/written ]] || result=1
  rm -r "$checkout"
  return "$result"
}

works_in_shared_mounts() {
  unshare --mount --propagation shared bash -c \
    "before=\$(wc -l </proc/self/mountinfo) && '$sandbox' true &&
     [[ \$(wc -l </proc/self/mountinfo) == \$before ]]"
}

as_plain_user() {
  setpriv --reuid 65534 --regid 65534 --clear-groups "$@"
}

works_for_plain_user() {
  local copy result=0
  copy=$(mktemp -d /var/tmp/sandbox_test.XXXXXX)
  mkdir "$copy/scripts"
  cp "$sandbox" "$copy/scripts/"
  chmod -R a+rX "$copy"
  (cd "$copy" && as_plain_user scripts/sandbox bash -c \
    'echo x >>/etc/crontab && echo x >/usr/zelo/etc/x && echo x >/tmp/x &&
     [[ $(stat -c %u /etc/crontab) == 0 ]]') || result=1
  rm -r "$copy"
  return "$result"
}

starts_quickly() {
  local start tenths
  start=$(date +%s%N)
  "$sandbox" true
  tenths=$((($(date +%s%N) - start) / 100000000))
  ((tenths < 100)) || { echo "took $tenths tenths of a second"; return 1; }
}

check "exit status 0 is passed on" passes_on_status 0
check "exit status 7 is passed on" passes_on_status 7
check "the status of a command ended by a signal is passed on" \
  same "$(status_of "$sandbox" bash -c 'kill -9 $$')" 137
check "arguments are passed on as they are" \
  same "$("$sandbox" printf '<%s>' 'a b' '' '*')" '<a b><><*>'
check "no command is a usage error" same "$(status_of "$sandbox")" 125
check "a machine without namespaces is told so" \
  same "$(status_of env PATH="$BUILD_DIR/none:/nonexistent" /bin/bash "$sandbox" true)" 125
check "the command knows that it is in the sandbox" \
  same "$(in_sandbox 'echo $ZELO_SANDBOX')" 1
check "/tmp, /run and /var/run are empty" \
  in_sandbox 'cd /; for d in /run /var/run; do [[ -z $(ls -A $d) ]] || exit 1; done
              [[ $(stat -c %a /tmp) == 1777 ]]'
check "/usr/zelo is there and writable" \
  in_sandbox '[[ -d /usr/zelo/etc && -d /usr/zelo/bin ]] && mkdir /usr/zelo/libexec'
check "the rest of /usr is the machine's" \
  same "$(in_sandbox 'ls /usr | grep -vx zelo')" "$(find /usr -maxdepth 1 -mindepth 1 -not -name zelo -printf '%f\n' | LC_ALL=C sort)"
check "/etc/crontab is there and root's" \
  same "$(in_sandbox 'stat -c "%U %a" /etc/crontab')" "root 644"
check "the machine is left alone" leaves_machine_alone
check "what is left running is killed" kills_what_is_left
check "orphans are reaped" reaps_orphans
check "processes are private" same "$(in_sandbox 'grep -h ^Name: /proc/1/status')" "$(printf 'Name:\tbash')"
check "a checkout below /tmp stays reachable and writable" keeps_checkout_below_tmp
check "it starts quickly" starts_quickly
check "the demonstration builds what it uses" demonstration_builds_what_it_uses
if unshare --mount --propagation shared true 2>/dev/null; then
  check "nothing is mounted outside where mounts are shared" works_in_shared_mounts
else
  skip "nothing is mounted outside where mounts are shared" "mounts cannot be shared here"
fi
if ((EUID == 0)) && as_plain_user unshare --map-root-user true 2>/dev/null; then
  check "it works for a plain user" works_for_plain_user
else
  skip "it works for a plain user" "root cannot try it here"
fi
finish
