"""Reads what json_tasks writes, and writes what it saves, with Python's own json."""

import base64
import codecs
import json
import random
import subprocess
import sys

KEYS = {
    "id", "can edit owner", "can edit name", "listable", "can run from ui", "can delete from ui",
    "can edit from ui", "can run app same time", "can run task same time", "simple edit form",
    "owner", "start year", "start month", "start day", "run hour", "run min", "repeat hour",
    "last work hour", "name", "edit form", "edit dialog", "app", "app name", "app args", "action",
    "week", "cmd", "state", "type",
}
CAPACITIES = {
    "name": 4096, "week": 8, "app": 1024, "app name": 1024, "app args": 8192, "action": 1024,
    "edit form": 1024, "edit dialog": 1024, "cmd": 12288,
}
# One replacement for each byte that is not UTF-8, where Python's own handler joins some.
codecs.register_error("each", lambda error: ("\ufffd" * (error.end - error.start), error.end))


def decoded(line):
    """The members of a JSON text, decoded twice."""
    assert line.isascii() and line.endswith("}\n"), line
    members = {key: json.loads(value) for key, value in json.loads(line).items()}
    assert set(members) == KEYS, set(members) ^ KEYS
    assert all(isinstance(value, str) for value in members.values())
    return members


def expected(key, raw):
    """What a text field reads as."""
    if key == "cmd":
        return base64.b64encode(raw).decode("ascii")
    return raw.replace(b"\n", b" ").decode("utf-8", "each")


def read_tasks(program, count):
    """Every text field of `count` random tasks is read as it is in the record."""
    out = subprocess.run([program, "write", str(count)], check=True, capture_output=True)
    lines = out.stdout.decode("ascii").splitlines(keepends=True)
    assert len(lines) == 2 * count, len(lines)
    lossless = 0
    for text, fields in zip(lines[::2], lines[1::2]):
        members = decoded(text)
        for field in fields.split():
            key, _, value = field.partition("=")
            raw = bytes.fromhex(value)
            key = key.replace("_", " ")
            assert members[key] == expected(key, raw), (key, raw, members[key])
            lossless += members[key].encode("utf-8") == raw
    assert lossless > count, "the tasks hold hardly any text that JSON can carry"


def random_text(numbers, longest):
    """Characters of every plane, within `longest` bytes of UTF-8."""
    ends = (0x80, 0x800, 0x10000, 0x110000)
    text, left = "", numbers.randrange(longest)
    while left >= 4:
        number = numbers.randrange(1, numbers.choice(ends))
        if not 0xD800 <= number <= 0xDFFF:
            text += chr(number)
            left -= len(text[-1].encode("utf-8"))
    return text


def save_tasks(program, count):
    """What Python writes is saved and given back, escaped or not."""
    numbers = random.Random(count)
    sent = []
    for _ in range(count):
        task = {key: random_text(numbers, min(size, 200)) for key, size in CAPACITIES.items()}
        task.update({"id": "-1", "run hour": str(numbers.randrange(24)), "run min": "30",
                     "state": "disabled", "type": numbers.choice(["once", "weekly"])})
        if not task["name"]:
            task["name"] = "n"
        sent.append(task)
    text = ""
    for task in sent:
        ascii_only = numbers.random() < 0.5
        members = {
            key: json.dumps(base64.b64encode(value.encode("utf-8")).decode("ascii")
                            if key == "cmd" else value, ensure_ascii=ascii_only) + "\n"
            for key, value in task.items()
        }
        text += json.dumps(members, ensure_ascii=ascii_only) + "\n"
    out = subprocess.run([program, "save"], input=text.encode("utf-8"), check=True,
                         capture_output=True)
    lines = out.stdout.decode("ascii").splitlines(keepends=True)
    assert len(lines) == count, len(lines)
    for task, line in zip(sent, lines):
        members = decoded(line)
        for key, value in task.items():
            if key != "id":
                wanted = expected(key, value.encode("utf-8"))
                assert members[key] == wanted, (key, value, members[key])


if __name__ == "__main__":
    {"read": read_tasks, "save": save_tasks}[sys.argv[1]](sys.argv[2], int(sys.argv[3]))
