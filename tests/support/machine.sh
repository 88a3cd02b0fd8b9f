#!/bin/bash
# A machine for the tests of many: a sandbox of its own with an sshd, as it is after a boot. It stays until
# it is ended.
#
#   scripts/sandbox tests/support/machine.sh NUMBER DIRECTORY PROGRAM
#
# It listens on 127.0.0.NUMBER by the sshd PROGRAM; DIRECTORY has the keys, and gets a file NUMBER.up when it
# can be reached.
set -euo pipefail

number=$1 directory=$2 program=$3
# The shell of the caller's tests has changed it to something that is private to them.
cd /run

printf '%032x\n' "$number" >/etc/machine-id
"$BUILD_DIR/bin/zelosched" restore >/dev/null
cp /bin/sleep /run/cron
(trap '' HUP && exec /run/cron 100000) &
echo $! >/run/crond.pid

# Names of users are the same everywhere, their numbers are not.
echo "payroll:x:$((2000 + number)):65534::/nonexistent:/bin/sh" >>/etc/passwd

grep -q '^sshd:' /etc/passwd || echo "sshd:x:990:65534::/run/sshd:/usr/sbin/nologin" >>/etc/passwd
mkdir -p /run/sshd
cat >/run/sshd_config <<CONFIG
ListenAddress 127.0.0.$number:22
HostKey $directory/host_key
AuthorizedKeysFile $directory/key.pub
PidFile none
PermitRootLogin prohibit-password
StrictModes no
UsePAM no
SetEnv PATH=$BUILD_DIR/bin:/usr/sbin:/usr/bin:/sbin:/bin
CONFIG
"$program" -D -e -f /run/sshd_config >"$directory/$number.log" 2>&1 &
sshd=$!
until (echo >"/dev/tcp/127.0.0.$number/22") 2>/dev/null; do
  kill -0 "$sshd" || exit
done
touch "$directory/$number.up"
wait "$sshd"
