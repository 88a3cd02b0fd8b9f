"""What the modules have in common: calling zelosched apply, and telling what it told."""
from __future__ import absolute_import, division, print_function

__metaclass__ = type

import json

VERSION = 1  # of the vocabulary, zelosched-json(5)
TO_DO = 3  # the exit status of a dry run that found something to do

COMMON_OPTIONS = {
    "stagger": {"type": "str"},
    "force": {"type": "bool", "default": False},
    "executable": {"type": "path"},
}


def executable_of(module):
    return module.params["executable"] or module.get_bin_path("zelosched", required=True)


def said(error):
    """The sentences that zelosched said, without its name."""
    return "\n".join(line[len("zelosched: "):] if line.startswith("zelosched: ") else line
                     for line in error.strip().splitlines())


def call(module, arguments, text=None, good=(0,)):
    status, out, error = module.run_command([executable_of(module)] + arguments, data=text)
    if status not in good:
        module.fail_json(msg=said(error) or "zelosched ended with %d" % status, rc=status, **told(module, out))
    return out


def told(module, out):
    """The changes that an apply told, which it does also when some of them failed."""
    try:
        answer = json.loads(out)
        changes = answer["changes"]
    except (ValueError, KeyError, TypeError):
        return {}
    is_changed = answer["crontab_written"] or any(c["change"] not in ("unchanged", "failed") for c in changes)
    result = {
        "changed": is_changed,
        "changes": [{name: c[name] for name in ("id", "name", "app", "change")} for c in changes],
    }
    if module._diff:
        result["diff"] = [diff_of(c) for c in changes if c["differences"]]
    return result


def diff_of(change):
    title = change["name"] if change["app"] is None else "%s (%s)" % (change["name"], change["app"])

    def side(which):
        return "".join("%s: %s\n" % (d["member"], json.dumps(d[which], ensure_ascii=False))
                       for d in change["differences"] if d[which] is not None)
    return {"before_header": title, "after_header": title, "before": side("before"), "after": side("after")}


def apply_tasks(module, tasks, apps=()):
    """Makes the tasks be as they are said to be; of the applications, no others. What became of them."""
    arguments = ["apply", "-", "--json", "--diff"]
    if module.check_mode:
        arguments.append("--dry-run")
    if module.params["force"]:
        arguments.append("--force")
    if module.params["stagger"] is not None:
        arguments += ["--stagger", module.params["stagger"]]
    if apps:
        arguments.append("--prune")
        for app in apps:
            arguments += ["--app", app]
    text = json.dumps({"version": VERSION, "tasks": tasks})
    out = call(module, arguments, text, (0, TO_DO) if module.check_mode else (0,))
    return told(module, out)
