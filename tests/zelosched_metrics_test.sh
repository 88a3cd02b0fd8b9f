#!/bin/bash
# A failed run, from the output of the metrics' unit through Prometheus' node exporter to the example
# alerts.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/own_network.sh
. "$here/support/own_network.sh"
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"
# shellcheck source=tests/support/zelosched_test.sh
. "$here/support/zelosched_test.sh"

readonly PACKAGING=$here/../packaging
readonly UNIT=$PACKAGING/systemd/zelosched-metrics.service
readonly ADDRESS=127.0.0.1:9100

exporter_program=$(daemon prometheus-node-exporter /usr/bin/prometheus-node-exporter)
if [[ ! -x $exporter_program ]]; then
  skip "a failed run leads to an alert" "scripts/deps fetches the node exporter"
  finish
fi

# The command that the unit runs, with the program of this build.
write_as_the_unit_does() {
  local command
  command=$(sed -n 's,^ExecStart=/usr/sbin/zelosched ,,p' "$UNIT")
  # shellcheck disable=SC2086
  z $command
}

# As Debian's package starts it: with that directory for the textfile collector.
start_exporter() {
  directory=$(sed -n 's/^ConditionPathIsDirectory=//p' "$UNIT")
  mount -n -t tmpfs collected /var/lib/prometheus
  mkdir -p "$directory"
  "$exporter_program" --collector.disable-defaults --collector.textfile \
    --collector.textfile.directory="$directory" --web.listen-address="$ADDRESS" >exporter.log 2>&1 &
  exporter=$!
  until scrape >/dev/null 2>&1; do
    kill -0 "$exporter" || { cat exporter.log; return 1; }
  done
}

scrape() {
  python3 -c 'import sys, urllib.request
with urllib.request.urlopen(sys.argv[1], timeout=10) as answer: sys.stdout.write(answer.read().decode())' "http://$ADDRESS/metrics"
}

is_scraped() {
  grep -qxF "$1" scraped || { echo "lacks: $1"; grep -e '^zelosched' -e '^node_textfile' scraped; return 1; }
}

a_failed_run_is_scraped() {
  clean
  add --daily 08:30 --name 'Nightly "backup" \ größe' --app backup -- 'echo oh; exit 7'
  add --daily 08:30 --name Mail -- true
  z run --wait 1 2 >/dev/null 2>&1 || true
  write_as_the_unit_does
  scrape >scraped
  # shellcheck disable=SC1003
  local labels='app="backup",task="Nightly \"backup\" \\ größe",task_id="1"'
  is_scraped "zelosched_task_last_run_outcome{app=\"backup\",outcome=\"failed\",${labels#*,}} 1" &&
    is_scraped "zelosched_task_last_run_exit_code{$labels} 7" &&
    is_scraped 'zelosched_task_last_run_outcome{app="",outcome="finished",task="Mail",task_id="2"} 1' &&
    is_scraped 'zelosched_runs{outcome="failed"} 1' && is_scraped 'node_textfile_scrape_error 0' &&
    grep -q 'node_textfile_mtime_seconds{file=".*/zelosched.prom"}' scraped
}

the_next_run_takes_its_place() {
  z edit 1 -- true >/dev/null
  z run --wait 1 >/dev/null
  write_as_the_unit_does
  scrape >scraped
  same "$(grep -c '^zelosched_task_last_run_outcome{.*task_id="1"' scraped)" 1 &&
    grep -q '^zelosched_task_last_run_outcome{.*outcome="finished".*task_id="1"} 1' scraped
}

alerts_fire_when_they_must() {
  sed "s,PACKAGING,$PACKAGING," "$here/support/zelosched_alerts.yml" >alerts.yml
  promtool test rules alerts.yml >alerts.log 2>&1 || { cat alerts.log; return 1; }
}

rules_are_well_formed() {
  promtool check rules "$PACKAGING/zelosched.rules.yml" >rules.log 2>&1 || { cat rules.log; return 1; }
}

start_zelosched_tests
start_exporter
check "what a failed run leaves is scraped from the node exporter" a_failed_run_is_scraped
check "and the next run takes its place" the_next_run_takes_its_place
check "the rules of the example are well formed" rules_are_well_formed
check "each alert fires when it must, and only then" alerts_fire_when_they_must
finish
