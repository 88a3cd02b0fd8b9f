#!/bin/bash
# The administrator's program as a script uses it: what it prints and changes, what it refuses, and
# how it fails. Here are the tests that act while it runs; the others are transcripts.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"
# shellcheck source=tests/support/have_terminals.sh
. "$here/support/have_terminals.sh"
# shellcheck source=tests/support/zelosched_test.sh
. "$here/support/zelosched_test.sh"

# answer_after COMMAND... -- ARGUMENTS...: "yes" to zelosched ARGUMENTS, when COMMAND has run since the
# question
answer_after() {
  python3 - "$ZELOSCHED" "$@" <<'PTY'
import os, pty, subprocess, sys
zelosched, *words = sys.argv[1:]
dashes = words.index("--")
pid, terminal = pty.fork()
if pid == 0:
    os.execv(zelosched, [zelosched, *words[dashes + 1:]])
seen = b""
while b"[y/N]" not in seen:
    seen += os.read(terminal, 1024)
subprocess.run(words[:dashes], check=True)
os.write(terminal, b"y\n")
try:
    while chunk := os.read(terminal, 1024):
        seen += chunk
except OSError:
    pass
print(seen.decode(), os.waitstatus_to_exitcode(os.waitpid(pid, 0)[1]))
PTY
}

replace_the_second() {
  z remove --yes 2 && z add --daily 10:30 --name precious -- true
}

nothing_but_what_was_shown_is_removed() {
  clean
  add --daily 08:30 --name first -- true
  add --daily 09:30 --name shown -- true
  export -f replace_the_second z
  export ZELOSCHED
  answer_after bash -c replace_the_second -- remove 2 >log
  grep -q "stays: it has been changed meanwhile" log && same "$(names)" "first precious"
}

# The power time that is asked about moves up in the list meanwhile.
a_power_time_that_was_shown_is_removed() {
  clean
  z power add on --daily 01:00 >/dev/null
  z power add on --daily 02:00 >/dev/null
  answer_after "$ZELOSCHED" power remove --yes 71270100 -- remove 71270200 >log &&
    grep -q "removed" log && same "$(names)" ""
}

goes_on_when_the_reader_is_gone() {
  clean
  rm -f ran fifo
  mkfifo fifo
  add --daily 08:30 -- "echo said; read go <$SCRATCH/fifo; seq 100000 && echo ran >$SCRATCH/ran"
  z run --output 1 2>err | head -n 1 >first &
  local pipeline=$!
  echo go >fifo
  wait "$pipeline" || true
  same "$(cat first err)" said || return 1
  until [[ -s ran ]]; do :; done
}

streams_output() {
  clean
  add --daily 08:30 -- 'head -c 1000000000 /dev/zero'
  local counts
  counts=$(python3 -c '
import resource, subprocess, sys
run = subprocess.Popen(sys.argv[1:], stdout=subprocess.PIPE)
size = 0
while part := run.stdout.read(1 << 20):
    size += len(part)
status = run.wait()
print(status, size, resource.getrusage(resource.RUSAGE_CHILDREN).ru_maxrss < 100 << 10)
' timeout 60 "$ZELOSCHED" run --output 1)
  same "$counts" "0 $((1000000000 + $(printf 'task 1 (Task 1) finished\n' | wc -c))) True"
}

start_zelosched_tests
transcripts zelosched_usage.txt zelosched_save.txt zelosched_import.txt zelosched_look.txt \
  zelosched_run.txt zelosched_power.txt zelosched_status.txt
check "nothing but what was shown is removed" nothing_but_what_was_shown_is_removed
check "and a power time that was shown, whatever its place" a_power_time_that_was_shown_is_removed
check "a run goes on when nobody reads its output any more" goes_on_when_the_reader_is_gone
check "of a long output no more is held than was read at once" streams_output
finish
