#!/usr/bin/python
from __future__ import absolute_import, division, print_function

__metaclass__ = type

DOCUMENTATION = r"""
module: task
short_description: Create, change or remove one scheduled task
description:
  - Creates, changes or removes one scheduled task, which is identified by its application and its name.
  - What is not given stays as it is on the machine, or is the default of a new task.
  - For many tasks, M(zelo.scheduler.tasks) is quicker, and removes those that are no longer wanted.
version_added: 4.0.0
options:
  name:
    description: The name of the task.
    type: str
    required: true
  app:
    description: The application that it belongs to.
    type: str
    default: ''
  state:
    description: Whether the task is to exist.
    type: str
    choices: [present, absent]
    default: present
  owner:
    description: The name of the user under whose rights it runs.
    type: str
  schedule:
    description:
      - When it runs, in the format of zelosched-json(5); see the examples.
      - Write times in quotes, as YAML takes C(10:30) for a number.
    type: dict
  command:
    description: What the shell runs.
    type: str
  time_limit:
    description: A run that goes on for longer is ended, such as C(90s), C(30m), C(2h) or C(1d). Empty for no limit.
    type: str
  enabled:
    description: Whether it runs at its times.
    type: bool
  overlap:
    description: Whether a run may overlap other runs.
    type: dict
    suboptions:
      task:
        description: Another run of the same task.
        type: bool
      app:
        description: Runs of other tasks of the same application.
        type: bool
  app_name:
    description: The name of the application for lists.
    type: str
  app_args:
    description: A text for the application.
    type: str
  action:
    description: What the task does, for display.
    type: str
  ui:
    description: How user interfaces show and offer it, in the format of zelosched-json(5).
    type: dict
extends_documentation_fragment:
  - zelo.scheduler.common
attributes:
  check_mode:
    description: Can run in C(check_mode) and predict what would be changed, without changing anything.
    support: full
  diff_mode:
    description: Tells what changes, member by member, in diff mode.
    support: full
author:
  - zeloscheduler maintainers (@zeloscheduler)
seealso:
  - module: zelo.scheduler.tasks
notes:
  - Changing tasks takes the rights of root.
  - A task is removed by its number, and only while the task of that number has this name and application. Where
    another program has meanwhile given the number to another task, nothing is removed and the module fails.
"""

EXAMPLES = r"""
- name: A backup every night
  zelo.scheduler.task:
    name: Nightly backup
    app: backup
    owner: backup
    schedule: {type: daily, at: "02:30"}
    command: /usr/local/bin/backup --all
    time_limit: 2h
  become: true

- name: No backup any more
  zelo.scheduler.task:
    name: Nightly backup
    app: backup
    state: absent
  become: true
"""

RETURN = r"""
changes:
  description: What became of the task; empty where it was to be absent and did not exist.
  returned: always
  type: list
  elements: dict
  contains:
    id:
      description: The number of the task on the machine; null where it does not exist yet.
      type: int
    name:
      description: Its name.
      type: str
    app:
      description: Its application; null where it has none.
      type: str
    change:
      description: C(created), C(changed), C(unchanged) or C(removed).
      type: str
  sample: [{"id": 1, "name": "Nightly backup", "app": "backup", "change": "created"}]
"""

import json

from ansible.module_utils.basic import AnsibleModule
from ansible_collections.zelo.scheduler.plugins.module_utils.zelosched import (
    COMMON_OPTIONS, apply_set, call, set_of, shown, stored_tasks)

MEMBERS = {
    "owner": {"type": "str"},
    "schedule": {"type": "dict"},
    "command": {"type": "str"},
    "time_limit": {"type": "str"},
    "enabled": {"type": "bool"},
    "overlap": {"type": "dict", "options": {"task": {"type": "bool"}, "app": {"type": "bool"}}},
    "app_name": {"type": "str"},
    "app_args": {"type": "str"},
    "action": {"type": "str"},
    "ui": {"type": "dict"},
}


def described(params):
    """The task, with the members that are given."""
    task = {name: params[name] for name in MEMBERS if params[name] is not None}
    task["name"] = params["name"]
    task["app"] = params["app"]
    if "overlap" in task:
        task["overlap"] = {name: flag for name, flag in task["overlap"].items() if flag is not None}
    if task.get("time_limit") == "":
        task["time_limit"] = None
    return task


def remove(module):
    name, app = module.params["name"], module.params["app"]
    found = [t for t in stored_tasks(module) if t["name"] == name and (t["app"] or "") == app]
    if len(found) > 1:
        module.fail_json(msg="tasks %s have this name and application: remove them by their numbers"
                         % " and ".join(str(t["id"]) for t in found))
    if not found:
        return {"changed": False, "changes": []}
    task = found[0]
    title = "task %d (%s)" % (task["id"], name)
    force = ["--force"] if module.params["force"] else []
    if not force and not task["ui"]["listable"]:
        module.fail_json(msg="%s is hidden by its application: 'force' removes it all the same" % title)
    if not force and not task["ui"]["can_delete"]:
        module.fail_json(msg="the application of %s does not let it be removed by hand" % title)
    if not module.check_mode:
        # Another task may have been given the number meanwhile.
        call(module, ["remove", "--yes", "--if-name=" + name, "--if-app=" + app] + force + [str(task["id"])])
    change = {"id": task["id"], "name": name, "app": task["app"], "change": "removed"}
    result = {"changed": True, "changes": [change]}
    if module._diff:
        result["diff"] = {"before": shown(json.dumps(task, indent=2, ensure_ascii=False)) + "\n", "after": ""}
    return result


def main():
    options = dict(
        COMMON_OPTIONS,
        name={"type": "str", "required": True},
        app={"type": "str", "default": ""},
        state={"type": "str", "choices": ["present", "absent"], "default": "present"},
        **MEMBERS
    )
    module = AnsibleModule(
        argument_spec=options,
        required_if=[("state", "present", ("owner", "schedule", "command"))],
        supports_check_mode=True,
    )
    if module.params["state"] == "absent":
        module.exit_json(**remove(module))
    module.exit_json(**apply_set(module, set_of([described(module.params)])))


if __name__ == "__main__":
    main()
