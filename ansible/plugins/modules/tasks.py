#!/usr/bin/python
from __future__ import absolute_import, division, print_function

__metaclass__ = type

DOCUMENTATION = r"""
module: tasks
short_description: Make the scheduled tasks match a set
description:
  - Creates and changes scheduled tasks until they match the set, by one C(zelosched apply) for the whole set.
  - A task is known by its application and its name. What the set does not say of a task stays as it is on the
    machine, or is the default of a new task.
  - When a task of the set has a fault, nothing is changed, and every fault is reported. When a task cannot be saved
    for another reason, the others are saved all the same, and the module fails.
version_added: 4.0.0
options:
  tasks:
    description:
      - The tasks, in the format of zelosched-json(5). Of each, C(name), C(owner), C(schedule) and C(command) must be
        given.
      - Write times in quotes, as YAML takes C(10:30) for a number.
      - One of I(tasks) and I(set) must be given.
    type: list
    elements: dict
  set:
    description:
      - The text of a file that C(zelosched export) wrote, or that was written by hand. The program reads it as it is,
        so that it refuses what another version wrote, members that it does not know, and members that are given twice.
      - Read it by C(lookup) and C(| string), as the examples show, or Ansible would parse it first.
    type: raw
  prune:
    description:
      - A list of applications of which every task that the set lacks is removed. A text instead of a list is refused.
      - An empty text in the list stands for the tasks that belong to no application.
    type: raw
    default: []
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
  - module: zelo.scheduler.task
notes:
  - Changing tasks takes the rights of root.
"""

EXAMPLES = r"""
- name: The tasks of the backup, and no others of it
  zelo.scheduler.tasks:
    prune: [backup]
    stagger: 30m
    tasks:
      - name: Nightly backup
        app: backup
        owner: backup
        schedule: {type: daily, at: "02:30"}
        command: /usr/local/bin/backup --all
        time_limit: 2h
      - name: Check the backup
        app: backup
        owner: backup
        schedule: {type: weekly, days: [sun], at: "12:00"}
        command: /usr/local/bin/backup --verify
  become: true

- name: A set that was exported from another machine
  zelo.scheduler.tasks:
    set: "{{ lookup('file', 'set.json') | string }}"
  become: true
"""

RETURN = r"""
changes:
  description: What became of each task, also of unchanged ones.
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
      description: C(created), C(changed), C(unchanged), C(removed) or C(failed).
      type: str
  sample: [{"id": 1, "name": "Nightly backup", "app": "backup", "change": "created"}]
"""

from ansible.module_utils.basic import AnsibleModule
from ansible_collections.zelo.scheduler.plugins.module_utils.zelosched import COMMON_OPTIONS, apply_set, set_of


def pruned(module):
    """The applications. Not a text: an empty variable would stand for the tasks of no application."""
    apps = module.params["prune"]
    if not isinstance(apps, list) or not all(isinstance(app, str) for app in apps):
        module.fail_json(msg="prune: must be a list of the names of applications, such as [backup]")
    return apps


def wanted(module):
    if module.params["set"] is None:
        return set_of(module.params["tasks"])
    if not isinstance(module.params["set"], str):
        module.fail_json(msg="set: must be the text of a file: write \"{{ lookup('file', 'set.json') | string }}\"")
    return module.params["set"]


def main():
    options = dict(
        COMMON_OPTIONS,
        tasks={"type": "list", "elements": "dict"},
        set={"type": "raw"},
        prune={"type": "raw", "default": []},
    )
    module = AnsibleModule(
        argument_spec=options,
        required_one_of=[("tasks", "set")],
        mutually_exclusive=[("tasks", "set")],
        supports_check_mode=True,
    )
    module.exit_json(**apply_set(module, wanted(module), pruned(module)))


if __name__ == "__main__":
    main()
