"""What the modules share: they call zelosched and return its results."""
from __future__ import absolute_import, division, print_function

__metaclass__ = type

import json
import re

VERSION = 1  # of the JSON format, zelosched-json(5)
TO_DO = 3  # the exit status of a dry run that found something to do
TIMED_OUT = 124  # the exit status of timeout(1) when the time is up
SECONDS_TO_END = 10  # from SIGTERM to SIGKILL

CHANGES = ("created", "changed", "unchanged", "removed", "failed")

COMMON_OPTIONS = {
    "stagger": {"type": "str"},
    "force": {"type": "bool", "default": False},
    "executable": {"type": "path"},
    "timeout": {"type": "int", "default": 600},
}

# What zelosched escapes too: control characters, marks of writing direction and line breaks, invisible
# characters; and lone surrogates, which cannot be encoded. Not the line feed.
UNSAFE = re.compile("[\x00-\x09\x0b-\x1f\x7f-\x9f\xad\u034f\u061c\u115f\u1160\u17b4\u17b5\u180b-\u180f\u200b\u200e\u200f"
                    "\u2028-\u202e\u2060-\u206f\u2800\u3164\ud800-\udfff\ufeff\uffa0\ufff9-\ufffb"
                    "\U0001d159\U0001d173-\U0001d17a\U000e0000-\U000e0fff]")


def shown(text):
    """The text with these escaped, so that a terminal interprets nothing but line feeds."""
    return UNSAFE.sub(lambda found: json.dumps(found.group())[1:-1], text)


def executable_of(module):
    return module.params["executable"] or module.get_bin_path("zelosched", required=True)


def said(error):
    """The messages of zelosched, without its name in front."""
    return "\n".join(line[len("zelosched: "):] if line.startswith("zelosched: ") else line
                     for line in error.strip().splitlines())


def call(module, arguments, text=None, good=(0,)):
    """What the program printed. The module fails unless its exit status is in `good`."""
    limit = module.params["timeout"]
    if limit < 0:
        module.fail_json(msg="timeout: %d is no number of seconds" % limit)
    command = [module.get_bin_path("timeout", required=True), "--kill-after=%d" % SECONDS_TO_END, str(limit)]
    status, out, error = module.run_command(command + [executable_of(module)] + arguments, data=text)
    if status in good:
        return out
    told_by_then = {}
    try:
        told_by_then = told(module, out)
    except ValueError:
        pass  # most failures print a message and no object
    message = said(error) or "zelosched ended with %d" % status
    if status == TIMED_OUT:
        message = "zelosched was ended after %d s: 'timeout' allows no more" % limit
    module.fail_json(msg=message, rc=status, **told_by_then)


def answer_of(out, member, types):
    """The object that the program printed, and its list `member`, of objects with these types."""
    try:
        answer = json.loads(out)
    except (ValueError, RecursionError):
        raise ValueError("no JSON")
    if not isinstance(answer, dict) or answer.get("version") != VERSION:
        raise ValueError("no object of version %d" % VERSION)
    objects = answer.get(member)
    if not isinstance(objects, list):
        raise ValueError("no list '%s'" % member)
    for entry in objects:
        if not isinstance(entry, dict):
            raise ValueError("something else than objects in '%s'" % member)
        for name, kinds in types.items():
            if name not in entry or not isinstance(entry[name], kinds):
                raise ValueError("no '%s' as it should be in '%s'" % (name, member))
    return answer, objects


def fail_without_answer(module, error):
    module.fail_json(msg="zelosched gave no answer that can be understood, but %s: "
                     "is 'executable' the program, and of this version?" % error)


MAYBE_TEXT = (str, type(None))


def told(module, out):
    """The module's result of what `apply --json` printed, also when some changes failed."""
    answer, changes = answer_of(out, "changes", {"id": (int, type(None)), "name": str, "app": MAYBE_TEXT,
                                                 "change": str, "differences": list})
    if not isinstance(answer.get("crontab_written"), bool):
        raise ValueError("no 'crontab_written'")
    for change in changes:
        if change["change"] not in CHANGES:
            raise ValueError("a change of another kind")
        for difference in change["differences"]:
            if not isinstance(difference, dict) or not {"member", "before", "after"} <= set(difference):
                raise ValueError("a difference of another kind")
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
    title = shown(title).replace("\n", "\\n")

    def side(which):
        return "".join("%s: %s\n" % (d["member"], shown(json.dumps(d[which], ensure_ascii=False)))
                       for d in change["differences"] if d[which] is not None)
    return {"before_header": title, "after_header": title, "before": side("before"), "after": side("after")}


def stored_tasks(module):
    """All tasks of the machine."""
    out = call(module, ["list", "--all", "--json"])
    try:
        tasks = answer_of(out, "tasks", {"id": int, "name": str, "app": MAYBE_TEXT, "ui": dict})[1]
        for task in tasks:
            for name in ("can_delete", "listable"):
                if not isinstance(task["ui"].get(name), bool):
                    raise ValueError("no '%s' in 'ui'" % name)
        return tasks
    except ValueError as error:
        fail_without_answer(module, error)


def set_of(tasks):
    """The text of a set that has these tasks."""
    return json.dumps({"version": VERSION, "tasks": tasks})


def apply_set(module, text, apps=()):
    """Applies the set, and removes what it lacks of these applications. The module's result."""
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
    out = call(module, arguments, text, (0, TO_DO) if module.check_mode else (0,))
    try:
        return told(module, out)
    except ValueError as error:
        fail_without_answer(module, error)
