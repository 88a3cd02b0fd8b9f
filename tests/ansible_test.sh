#!/bin/bash
# The Ansible collection, played by Debian's Ansible over ssh against three machines, each of which is
# a sandbox with an sshd.
#
# Functions are called by check:
# shellcheck disable=SC2317
set -euo pipefail

here=$(cd "$(dirname "$0")" && pwd -P)
# shellcheck source=tests/support/own_network.sh
. "$here/support/own_network.sh"
# shellcheck source=tests/support/shell_test.sh
. "$here/support/shell_test.sh"

readonly SCRATCH=/run/fleet
readonly ROOT=$here/..
readonly MACHINES="11 12 13"

sshd=$(daemon openssh-server /usr/sbin/sshd)
if ! command -v ansible-playbook >/dev/null || [[ ! -x $sshd ]]; then
  skip "many machines are managed" "scripts/deps installs ansible-core and sshd"
  finish
fi
if ((EUID != 0)) || [[ $(awk '{ print $3 }' /proc/self/uid_map) == 1 ]]; then
  skip "many machines are managed" "sshd needs more users than this sandbox has"
  finish
fi

# ---- machines -------------------------------------------------------------------------------

prepare() {
  mkdir -p "$SCRATCH"
  cd "$SCRATCH"
  ssh-keygen -q -t ed25519 -N '' -f key
  ssh-keygen -q -t ed25519 -N '' -f host_key
  local number
  for number in $MACHINES; do echo "127.0.0.$number $(cat host_key.pub)" >>known_hosts; done
  # A configuration of the test's own, without the user's.
  export HOME=$SCRATCH ANSIBLE_HOME=$SCRATCH/ansible ANSIBLE_CONFIG=$SCRATCH/ansible.cfg
  export ANSIBLE_COLLECTIONS_PATH=$SCRATCH/collections LC_ALL=C.UTF-8
  if ! { ansible-galaxy collection build "$ROOT/ansible" &&
    ansible-galaxy collection install --offline -p collections zelo-scheduler-*.tar.gz; } >galaxy.log 2>&1; then
    cat galaxy.log
    exit 1
  fi
  mkdir callbacks
  cp "$here/support/ansible_told.py" callbacks
  cat >ansible.cfg <<CONFIG
[defaults]
remote_tmp = /run/ansible
interpreter_python = /usr/bin/python3
nocows = true
stdout_callback = ansible_told
callback_plugins = $SCRATCH/callbacks
[ssh_connection]
ssh_args = -F none -i $SCRATCH/key -o UserKnownHostsFile=$SCRATCH/known_hosts -o ControlMaster=auto -o ControlPersist=60
pipelining = true
CONFIG
  {
    echo "[all]"
    for number in $MACHINES; do echo "machine$number ansible_host=127.0.0.$number"; done
    echo "[all:vars]"
    echo "ansible_user=root"
  } >inventory
}

start_machine() {
  rm -f "$SCRATCH/$1.up"
  "$ROOT/scripts/sandbox" "$here/support/machine.sh" "$1" "$SCRATCH" "$sshd" &
  eval "machine_$1=$!"
  until [[ -e $SCRATCH/$1.up ]]; do kill -0 "$!"; done
}

stop_machine() {
  local process=machine_$1
  kill -KILL "${!process}" # which ends the whole sandbox
  wait "${!process}" 2>/dev/null || true
}

# on NUMBER COMMAND...
on() {
  local number=$1
  shift
  timeout 60 ssh -F none -i "$SCRATCH/key" -o UserKnownHostsFile="$SCRATCH/known_hosts" "root@127.0.0.$number" "$@"
}

# ---- playing --------------------------------------------------------------------------------

# play [OPTION...]: plays the example with set.json, without installing; sets $status, writes out.json
play() {
  status=0
  timeout 100 ansible-playbook -i inventory zelo.scheduler.fleet \
    --skip-tags packages -e set="$SCRATCH/set.json" -e '{"applications": ["backup"]}' "$@" \
    >out.json 2>err || status=$?
}

# of EXPRESSION: `hosts` has what each task of the play gave on each machine, `stats` the sums
of() {
  python3 -c 'import json, sys
with open("out.json") as file: hosts, stats = json.load(file).values()
def changes(host): return [(c["name"], c["change"]) for c in hosts[host]["The tasks are those of the set"]["changes"]]
print(eval(sys.argv[1]))' "$1"
}

# module NAME OPTIONS: runs a module alone, in the sandbox of the test; its result is in result.json
module() {
  /usr/bin/python3 - "$1" "$2" >result.json 2>err <<'PY'
import json, runpy, sys
sys.path.insert(0, "collections")
from ansible.module_utils import basic
name, options = sys.argv[1:]
basic._ANSIBLE_ARGS = json.dumps({"ANSIBLE_MODULE_ARGS": json.loads(options)}).encode()
runpy.run_path("collections/ansible_collections/zelo/scheduler/plugins/modules/%s.py" % name, run_name="__main__")
PY
}

# of_module EXPRESSION: of the result `r`
of_module() {
  python3 -c 'import json, sys
with open("result.json") as file: r = json.load(file)
print(eval(sys.argv[1]))' "$1" || cat result.json err
}

# fake STATUS ANSWER: makes a program that takes the place of zelosched
fake() {
  # shellcheck disable=SC2016
  printf '#!/bin/sh\n[ "$1" = list ] || cat >/dev/null\ncat "$0.answer"\nexit %d\n' "$1" >fake
  printf '%s' "$2" >fake.answer
  chmod +x fake
}

# is OPERATION...: compares, and shows what Ansible said when they differ
is() {
  same "$@" || { head -c 4000 out.json err; return 1; }
}

# a_set TIME [NAME...]: a set of one backup that payroll owns, and a task for each name
a_set() {
  python3 - "$@" <<'PY'
import json, sys
def task(name, at): return {"name": name, "app": "backup", "owner": "payroll", "command": "true",
                            "schedule": {"type": "daily", "at": at}}
print(json.dumps({"version": 1, "tasks": [task("Nightly", sys.argv[1]), *(task(n, "03:00") for n in sys.argv[2:])]}))
PY
}

# The names and times of the tasks of a machine
tasks_of() {
  on "$1" zelosched export | python3 -c 'import json, sys
print(*sorted(t["name"] + "@" + t["schedule"]["at"] for t in json.load(sys.stdin)["tasks"]))'
}

each_has() {
  local number
  for number in $MACHINES; do same "$(tasks_of "$number")" "$1" || return 1; done
}

check_mode_predicts_the_first_play() {
  a_set 02:30 Weekly >set.json
  play --check --diff
  is "$status $(of '[changes(h) for h in sorted(hosts)]')" \
    "0 [$(printf "[('Nightly', 'created'), ('Weekly', 'created')], %.0s" 1 2 | sed 's/, $//'), [('Nightly', 'created'), ('Weekly', 'created')]]" &&
    is "$(of '{(h, s["changed"]) for h, s in stats.items()} == {("machine%d" % n, 1) for n in (11, 12, 13)}')" True &&
    is "$(of '"command: \"true\"" in hosts["machine11"]["The tasks are those of the set"]["diff"][0]["after"]')" True &&
    each_has ""
}

the_first_play_changes() {
  play
  is "$status $(of 'sorted(s["changed"] for s in stats.values())')" "0 [1, 1, 1]" &&
    is "$(of 'changes("machine12")')" "[('Nightly', 'created'), ('Weekly', 'created')]" &&
    each_has "Nightly@02:30 Weekly@03:00"
}

# Whatever the uid is there.
an_owner_is_the_same_person_everywhere() {
  local number
  for number in $MACHINES; do
    same "$(on "$number" zelosched list --json | python3 -c 'import json, sys
print({(t["owner"], t["owner_uid"]) for t in json.load(sys.stdin)["tasks"]})')" "{('payroll', $((2000 + number)))}" || return 1
  done
}

the_second_play_changes_nothing() {
  play --diff
  is "$status $(of 'sorted(s["changed"] for s in stats.values())')" "0 [0, 0, 0]" &&
    is "$(of 'changes("machine13")')" "[('Nightly', 'unchanged'), ('Weekly', 'unchanged')]"
}

a_machine_that_differs_alone_is_changed() {
  on 12 zelosched edit Nightly --daily 05:00 >/dev/null
  play --check --diff
  is "$(of 'sorted((h, s["changed"]) for h, s in stats.items())')" "[('machine11', 0), ('machine12', 1), ('machine13', 0)]" &&
    is "$(of '{n: hosts["machine12"]["The tasks are those of the set"]["diff"][0][n] for n in ("before", "after")}')" \
      "{'before': 'schedule.at: \"05:00\"\\n', 'after': 'schedule.at: \"02:30\"\\n'}" || return 1
  play
  is "$(of 'sorted((h, s["changed"]) for h, s in stats.items())')" "[('machine11', 0), ('machine12', 1), ('machine13', 0)]" &&
    each_has "Nightly@02:30 Weekly@03:00"
}

others_keep_their_own_and_the_set_loses_one() {
  local number
  for number in $MACHINES; do on "$number" zelosched add --daily 01:00 --name own -- true >/dev/null; done
  a_set 02:30 >set.json
  play --check
  is "$(of 'changes("machine11")')" "[('Weekly', 'removed'), ('Nightly', 'unchanged')]" &&
    each_has "Nightly@02:30 Weekly@03:00 own@01:00" || return 1
  play
  is "$status $(of 'changes("machine13")')" "0 [('Weekly', 'removed'), ('Nightly', 'unchanged')]" &&
    each_has "Nightly@02:30 own@01:00"
}

an_unreachable_machine_disturbs_no_other() {
  stop_machine 12
  a_set 02:45 >set.json
  play
  is "$((status != 0)) $(of 'sorted((h, s["unreachable"], s["changed"]) for h, s in stats.items())')" \
    "1 [('machine11', 0, 1), ('machine12', 1, 0), ('machine13', 0, 1)]" &&
    same "$(tasks_of 11) $(tasks_of 13)" "Nightly@02:45 own@01:00 Nightly@02:45 own@01:00"
}

# It comes up without any task, like a new machine.
and_has_all_when_it_is_back() {
  start_machine 12
  play
  is "$status $(of 'sorted((h, s["changed"]) for h, s in stats.items())')" "0 [('machine11', 0), ('machine12', 1), ('machine13', 0)]" &&
    same "$(tasks_of 12)" "Nightly@02:45"
}

a_machine_that_refuses_disturbs_no_other() {
  on 11 "sed -i /^payroll:/d /etc/passwd"
  a_set 02:50 >set.json
  play
  is "$((status != 0)) $(of 'sorted((h, s["failures"], s["changed"]) for h, s in stats.items())')" \
    "1 [('machine11', 1, 0), ('machine12', 0, 1), ('machine13', 0, 1)]" &&
    is "$(of 'hosts["machine11"]["The tasks are those of the set"]["msg"].splitlines()')" \
      "[\"tasks[0].owner: there is no user 'payroll', the owner of 'Nightly': write the name of one that 'getent passwd' lists\", 'nothing was applied, because of 1 fault']" &&
    same "$(tasks_of 11)" "Nightly@02:45 own@01:00"
  local is_right=$?
  on 11 "echo payroll:x:2011:65534::/:/bin/sh >>/etc/passwd"
  return "$is_right"
}

a_machine_without_cron_fails_the_play() {
  play
  is "$status" 0 || return 1
  # shellcheck disable=SC2016
  on 13 'kill $(cat /run/crond.pid)'
  play
  is "$((status != 0)) $(of 'sorted((h, s["failures"]) for h, s in stats.items())')" \
    "1 [('machine11', 0), ('machine12', 0), ('machine13', 1)]" &&
    is "$(of '"cron is not running" in hosts["machine13"]["Tasks run"]["stdout"]')" True
}

machines_begin_at_times_of_their_own() {
  a_set 02:30 >set.json
  play --limit machine11,machine12 -e stagger=2h
  is "$status" 0 || return 1
  local first second
  first=$(tasks_of 11) second=$(tasks_of 12)
  [[ $first == *Nightly@0[234]* && $second == *Nightly@0[234]* && ${first%% *} != "${second%% *}" ]] ||
    { echo "$first, $second"; return 1; }
  play --limit machine11,machine12 -e stagger=2h
  is "$(of 'sorted(s["changed"] for s in stats.values())')" "[0, 0]"
}

applications_are_a_list() {
  local value
  a_set 02:30 >set.json
  for value in applications= applications=backup; do
    play --limit machine11 -e "$value"
    is "$((status != 0)) $(of '"list" in hosts["machine11"]["The applications are a list"]["msg"]')" "1 True" &&
      is "$(of '"The tasks are those of the set" in hosts["machine11"]')" False || return 1
  done
}

# With the messages of zelosched itself.
a_set_is_read_by_the_program() {
  local before wanted file
  before=$(tasks_of 11)
  local task='"name": "t", "app": "backup", "command": "docker ps --format {{.Names}}", "schedule": {"type": "daily", "at": "03:00"}'
  while IFS='|' read -r wanted file; do
    echo "$file" >set.json
    play --limit machine11
    is "$((status != 0)) $(of "'$wanted' in hosts['machine11']['The tasks are those of the set']['msg']")" "1 True" &&
      same "$(tasks_of 11)" "$before" || return 1
  done <<SETS
version: is 2|{"version": 2, "tasks": [{$task, "owner": "root"}]}
taskz|{"version": 1, "taskz": [], "tasks": [{$task, "owner": "root"}]}
owner|{"version": 1, "tasks": [{$task, "owner": "nobody", "owner": "root"}]}
SETS
  echo "{\"version\": 1, \"tasks\": [{$task, \"owner\": \"root\"}]}" >set.json
  play --limit machine11
  is "$status" 0 && same "$(on 11 zelosched export | grep -cF 'docker ps --format {{.Names}}')" 1
}

# As when zelosched cannot be run.
a_status_that_cannot_be_told_fails_the_play() {
  sed 's/zelosched status/zelosched-that-is-not-there status/' \
    collections/ansible_collections/zelo/scheduler/playbooks/fleet.yml >broken.yml
  a_set 02:30 >set.json
  status=0
  timeout 100 ansible-playbook -i inventory broken.yml --limit machine11 --skip-tags packages -e set="$SCRATCH/set.json" \
    >out.json 2>err || status=$?
  is "$((status != 0)) $(of '(stats["machine11"]["failures"], hosts["machine11"]["Tasks run"]["failed_when_result"])')" "1 (1, True)"
}

# ---- without Ansible ------------------------------------------------------------------------

a_file_over_ssh_does_it_too() {
  local number status told=""
  a_set 04:30 Weekly >set.json
  for number in 11 12; do
    status=0
    on "$number" zelosched apply - --prune --app backup --dry-run <set.json >/dev/null || status=$?
    told+="$status "
    on "$number" zelosched apply - --prune --app backup <set.json >/dev/null || told+="failed "
    status=0
    on "$number" zelosched apply - --prune --app backup --dry-run <set.json >/dev/null || status=$?
    told+="$status "
  done
  same "$told$(tasks_of 12)" "3 0 3 0 Nightly@04:30 Weekly@03:00"
}

# The postinst script in docs/fleet.md.
a_package_of_the_set_does_it_too() {
  a_set 04:45 >set.json
  sed -n '/^    #!\/bin\/sh/,/^    fi/s/^    //p' "$ROOT/docs/fleet.md" |
    sed "s,/usr/share/our-tasks/set.json,/run/set.json," >postinst
  grep -q stagger postinst || return 1
  on 12 'cat >/run/set.json' <set.json && on 12 sh -s triggered <postinst >told &&
    same "$(cat told)$(tasks_of 12)" "Nightly@04:30 Weekly@03:00" || return 1
  on 12 sh -s configure <postinst >told && on 12 sh -s configure <postinst >again &&
    same "$(sort told again)" "$(sort <<<"task 2 (Weekly) removed
task 1 (Nightly) changed
task 1 (Nightly) unchanged")"
}

# ---- the module for one task ----------------------------------------------------------------

# one_task OPTIONS [MODE...]: runs the module for one task
one_task() {
  status=0
  timeout 100 ansible -i inventory machine11 -m zelo.scheduler.task -a "$1" "${@:2}" >out.txt 2>&1 || status=$?
}

one_task_comes_changes_and_goes() {
  local present='{"name": "Alone", "app": "mail", "owner": "root", "command": "true", "time_limit": "2h", "schedule": {"type": "daily", "at": "08:30"}}'
  local step options wanted mode
  while IFS='|' read -r step mode options wanted; do
    # shellcheck disable=SC2086
    one_task "$options" $mode
    if [[ $wanted == refused && $status == 0 ]] ||
      { [[ $wanted != refused ]] && ! grep -q "\"changed\": $wanted" out.txt; }; then
      echo "$step:"
      cat out.txt
      return 1
    fi
  done <<STEPS
predicted|--check|$present|true
created||$present|true
unchanged||$present|false
enabled is not compared||{"name": "Alone", "app": "mail", "owner": "root", "command": "true", "schedule": {"type": "daily", "at": "08:30"}}|false
changed||{"name": "Alone", "app": "mail", "owner": "root", "command": "true", "time_limit": "", "enabled": "no", "schedule": {"type": "daily", "at": "08:30"}}|true
going is predicted|--check|{"name": "Alone", "app": "mail", "state": "absent"}|true
another application's stays||{"name": "Alone", "state": "absent"}|false
gone||{"name": "Alone", "app": "mail", "state": "absent"}|true
gone already||{"name": "Alone", "app": "mail", "state": "absent"}|false
a protected one||{"name": "Alone", "owner": "root", "command": "true", "schedule": {"type": "daily", "at": "08:30"}, "ui": {"can_delete": false}}|true
its refusal is predicted|--check|{"name": "Alone", "state": "absent"}|refused
it stays||{"name": "Alone", "state": "absent"}|refused
unless one insists||{"name": "Alone", "state": "absent", "force": true}|true
STEPS
}

faults_are_told_by_the_module() {
  one_task '{"name": "n", "owner": "root", "command": "true", "schedule": {"type": "daily", "at": 630}}'
  if [[ $status == 0 ]] || ! grep -q 'tasks\[0\].schedule.at: 630 is no time of day' out.txt; then
    cat out.txt
    return 1
  fi
}

readonly HALF='"version": 1, "crontab_written": false'

# An answer that is no JSON of the expected form is a failure, whatever the status.
what_is_no_answer_fails() {
  local mode wanted answer options
  while IFS='|' read -r mode wanted answer; do
    fake "$mode" "$answer"
    options='"executable": "/run/fleet/fake", "_ansible_diff": true, "_ansible_check_mode": '
    if ((mode == 3)); then options+=true; else options+=false; fi
    module tasks "{\"tasks\": [], $options}" || true
    same "$(of_module "(r.get('failed', False), '$wanted' in r.get('msg', ''))")" "(True, True)" ||
      { echo "$mode $answer"; return 1; }
    if ((mode != 0)); then continue; fi
    module task "{\"name\": \"n\", \"state\": \"absent\", $options}" || true
    same "$(of_module "(r.get('failed', False), '$wanted' in r.get('msg', ''))")" "(True, True)" ||
      { echo "absent $mode $answer"; return 1; }
  done <<ANSWERS
0|no answer|
0|no answer|not json
0|no answer|[]
0|no answer|7
0|no answer|{"version": 1}
0|no answer|{$HALF, "changes": {}, "tasks": {}}
0|no answer|{$HALF, "changes": [{}], "tasks": [{}]}
0|no answer|{$HALF, "changes": [7], "tasks": [7]}
0|no answer|{$HALF, "changes": [{"id": 1, "name": 7, "app": null, "change": "created", "differences": []}], "tasks": [{"id": 1, "name": 7, "app": null, "ui": {}}]}
0|no answer|{$HALF, "changes": [{"id": 1, "name": "n", "app": null, "change": "made", "differences": []}], "tasks": [{"id": "1", "name": "n", "app": null, "ui": {}}]}
0|no answer|{$HALF, "changes": [{"id": 1, "name": "n", "app": null, "change": "created"}], "tasks": [{"id": 1, "name": "n", "app": null, "ui": {}}]}
0|no answer|{"version": 2, "crontab_written": false, "changes": [], "tasks": []}
3|no answer|not json
3|no answer|{"changes": [{}], "crontab_written": false, "version": 1}
1|ended with 1|not json
1|ended with 1|{"changes": [{}], "crontab_written": false, "version": 1}
ANSWERS
}

a_program_that_goes_on_is_ended() {
  printf '#!/bin/sh\nexec sleep 100\n' >fake
  local began=$SECONDS
  module tasks '{"tasks": [], "executable": "/run/fleet/fake", "timeout": 1}' || true
  same "$(of_module "r['msg']")" "zelosched was ended after 1 s: 'timeout' allows no more" && ((SECONDS - began < 30))
}

# z COMMAND...: zelosched in the sandbox of the test
z() {
  "$BUILD_DIR/bin/zelosched" "$@"
}

here_are() {
  same "$(z list --all --json | python3 -c 'import json, sys
print(*sorted(t["name"] for t in json.load(sys.stdin)["tasks"]))')" "$*"
}

# An empty text is what a variable without a value gives.
only_a_list_is_pruned() {
  z restore >/dev/null
  z add --daily 01:00 --name own -- true >/dev/null
  local prune
  for prune in '""' '"backup"' 'null' '{"backup": 1}' '[7]' '[null]'; do
    module tasks "{\"tasks\": [], \"executable\": \"$BUILD_DIR/bin/zelosched\", \"prune\": $prune}" || true
    [[ $prune == null ]] || same "$(of_module "r['msg'].startswith('prune: ')")" True || { echo "$prune"; return 1; }
    here_are own || return 1
  done
  module tasks "{\"tasks\": [], \"executable\": \"$BUILD_DIR/bin/zelosched\", \"prune\": [\"\"]}"
  here_are
}

a_hidden_task_goes_by_force_alone() {
  z apply - >/dev/null <<<'{"version": 1, "tasks": [{"name": "hidden", "owner": "root", "command": "true",
    "schedule": {"type": "daily", "at": "08:30"}, "ui": {"listable": false}}]}'
  local mode absent="\"name\": \"hidden\", \"state\": \"absent\", \"executable\": \"$BUILD_DIR/bin/zelosched\""
  for mode in true false; do
    module task "{$absent, \"_ansible_check_mode\": $mode}" || true
    same "$(of_module "'hidden by its application' in r['msg']")" True && here_are hidden || return 1
  done
  module task "{$absent, \"force\": true}" && here_are
}

# Another task gets the number between list and remove.
another_task_with_the_number_stays() {
  cat >racy <<SCRIPT
#!/bin/sh
if [ "\$1" = remove ]; then
  "$BUILD_DIR/bin/zelosched" remove --yes 1 >/dev/null
  "$BUILD_DIR/bin/zelosched" add --daily 05:00 --name Important -- true >/dev/null
fi
exec "$BUILD_DIR/bin/zelosched" "\$@"
SCRIPT
  chmod +x racy
  z add --daily 01:00 --name Nightly -- true >/dev/null
  module task '{"name": "Nightly", "state": "absent", "executable": "/run/fleet/racy"}' || true
  same "$(of_module "(r.get('failed'), \"task 1 (Important) is not the expected task 'Nightly'\" in r.get('msg', ''))")" \
    "(True, True)" && here_are Important
}

# The diff is shown on a terminal, so control characters must be escaped.
the_diff_is_shown_safely() {
  local unsafe='\u001b[2J\u009b2J\u202e\u2066\u3164\u2800\u007f\n\udb40\udc01'
  fake 0 "{\"version\": 1, \"crontab_written\": false, \"changes\": [{\"id\": 1, \"name\": \"größe$unsafe\", \"app\": \"b$unsafe\",
    \"change\": \"changed\", \"differences\": [{\"member\": \"command\", \"before\": \"a$unsafe\", \"after\": \"ö$unsafe\"}]}]}"
  module tasks '{"tasks": [], "executable": "/run/fleet/fake", "_ansible_diff": true}'
  same "$(of_module 'r["diff"]')" "$(U=$unsafe python3 -c 'import os
u = os.environ["U"]; h = "größe%s (b%s)" % (u, u)
print([{"before_header": h, "after_header": h, "before": "command: \"a%s\"\n" % u, "after": "command: \"ö%s\"\n" % u}])')" || return 1
  fake 0 "{\"version\": 1, \"tasks\": [{\"id\": 1, \"name\": \"n\", \"app\": null, \"action\": \"ö$unsafe\",
    \"ui\": {\"can_delete\": true, \"listable\": true}}]}"
  module task '{"name": "n", "state": "absent", "executable": "/run/fleet/fake", "_ansible_diff": true, "_ansible_check_mode": true}'
  same "$(of_module 'r["diff"]["before"].splitlines()[4]')" "  \"action\": \"ö$unsafe\","
}

modules_are_described() {
  local module
  for module in task tasks; do
    if ! ansible-doc "zelo.scheduler.$module" >out.txt 2>&1 || ! grep -q 'EXAMPLES' out.txt ||
      ! grep -q 'RETURN VALUES' out.txt; then
      cat out.txt
      return 1
    fi
  done
}

# ansible-doc shows every option that a module takes, and no other.
descriptions_are_whole() {
  ansible-doc -j zelo.scheduler.task zelo.scheduler.tasks >documented.json || return 1
  /usr/bin/python3 - <<'PY'
import importlib.util, json, sys
sys.path.insert(0, "collections")
from unittest import mock
with open("documented.json") as file: described = json.load(file)
assert described.keys() == {"zelo.scheduler.task", "zelo.scheduler.tasks"}, described.keys()
for name, module_description in described.items():
    path = "collections/ansible_collections/zelo/scheduler/plugins/modules/%s.py" % name.rsplit(".")[-1]
    spec = importlib.util.spec_from_file_location("module", path)
    module = importlib.util.module_from_spec(spec)
    spec.loader.exec_module(module)
    documented = module_description["doc"]["options"]
    with mock.patch.object(module, "AnsibleModule", side_effect=KeyboardInterrupt) as made:
        try:
            module.main()
        except KeyboardInterrupt:
            pass
    taken = made.call_args.kwargs["argument_spec"]
    assert documented.keys() == taken.keys(), (path, documented.keys() ^ taken.keys())
    for name, option in taken.items():
        for key in ("type", "default", "choices", "elements", "required"):
            assert documented[name].get(key) == option.get(key), (path, name, key)
PY
}

prepare
for number in $MACHINES; do start_machine "$number"; done
check "check mode predicts what the first play does" check_mode_predicts_the_first_play
check "the first play changes all machines" the_first_play_changes
check "an owner is the same person on each, whatever his number" an_owner_is_the_same_person_everywhere
check "the second play changes nothing" the_second_play_changes_nothing
check "a machine that differs is changed, and no other" a_machine_that_differs_alone_is_changed
check "a task that leaves the set is removed everywhere, and no other" others_keep_their_own_and_the_set_loses_one
check "an unreachable machine disturbs no other" an_unreachable_machine_disturbs_no_other
check "and has all when it is back" and_has_all_when_it_is_back
check "a machine that refuses the set disturbs no other, and says why" a_machine_that_refuses_disturbs_no_other
check "a machine without cron fails the play" a_machine_without_cron_fails_the_play
check "machines begin at times of their own, always the same" machines_begin_at_times_of_their_own
check "applications that are no list are refused" applications_are_a_list
check "a set is read by the program, with its guards" a_set_is_read_by_the_program
check "a status that cannot be told fails the play" a_status_that_cannot_be_told_fails_the_play
check "a file over ssh does the same" a_file_over_ssh_does_it_too
check "and so does a package of the set, as the documentation has it" a_package_of_the_set_does_it_too
check "one task comes, changes and goes" one_task_comes_changes_and_goes
check "what is wrong with a task is told" faults_are_told_by_the_module
check "what is no answer of the program fails" what_is_no_answer_fails
check "a program that goes on for too long is ended" a_program_that_goes_on_is_ended
check "only a list of applications is pruned" only_a_list_is_pruned
check "a hidden task goes by force alone" a_hidden_task_goes_by_force_alone
check "another task that has got the number stays" another_task_with_the_number_stays
check "a diff is shown without what a terminal obeys" the_diff_is_shown_safely
check "ansible-doc describes the modules" modules_are_described
check "and each of their options as it is" descriptions_are_whole
for number in $MACHINES; do stop_machine "$number"; done
finish
