"""Runs transcripts: files of tests, each of which is what a user types and what must come back.

  == a task is saved                  a test and its name; "== [root] ..." takes other users
  $ zelosched add --daily 08:30       a command of the shell, which
  > -- 'echo it'                      goes on in lines that begin with ">"
  task 1 (Task 1) saved: ...          what it prints; "..." stands for anything in the line,
  ! zelosched: a warning              and a line of it alone for any number of lines,
  [status 1]                          on standard error, and its exit status unless that is 0

Lines of "# " and blank lines before a test are comments. Nothing else is overlooked: what differs from run to
run is a "..." in the file. A test can be written once for a table:

  == status tells: {part}
  with: damage :: part
  rm $STORE :: {store} is missing     each row is a test of its own, in which the row's texts stand for
                                      {damage} and {part}; a blank line ends the table

The commands of a test are run by one shell, with the functions of LIBRARY, a shell script; "clean" of these is
called first.

  transcript.py LIBRARY FILE...            a line for each test, as shell_test.sh prints
  transcript.py --update LIBRARY FILE...   writes what was printed into the files, where it differs
"""

import difflib
import os
import re
import subprocess
import sys
import tempfile

RUN = """
. "$1"
into=$2
shift 2
clean
for command; do
  step=$((${step:-0} + 1)) status=0
  eval "$command" >"$into/$step.out" 2>"$into/$step.err" </dev/null || status=$?
  echo "$status" >"$into/$step.exit"
done
"""


class Test:
    """A test: its lines up to the first command, and its steps, [command, [line wanted, ...]] each."""

    def __init__(self, name):
        self.name, self.head, self.steps, self.keys, self.rows = name, [], [], [], []

    def take(self, line):
        if line.startswith("$ "):
            self.steps.append([line[2:], []])
        elif line.startswith("> ") and self.steps and not self.steps[-1][1]:
            self.steps[-1][0] += "\n" + line[2:]
        elif self.steps:
            self.steps[-1][1].append(line)
        else:
            self.head.append(line)
            if line.startswith("with: "):
                self.keys = line[6:].split(" :: ")
            elif self.keys and line:
                self.rows.append(line.split(" :: "))

    def variants(self):
        """The test itself, or one for each row of its table."""
        for row in self.rows or [[]]:
            if len(row) != len(self.keys):
                raise SystemExit(f"{self.name}: a row of other columns: {row}")

            def fill(text, row=row):
                for key, value in zip(self.keys, row):
                    text = text.replace("{" + key + "}", value)
                return text
            yield fill(self.name), [[fill(command), [fill(line) for line in wanted]]
                                    for command, wanted in self.steps]


def parse(path):
    """The comments and tests of a file in their order. What stands before a "==" is about that test."""
    parts, pending = [], []
    with open(path, encoding="utf-8", errors="surrogateescape") as file:
        for line in file.read().split("\n"):
            if line.startswith("== "):
                parts += [pending, Test(line[3:])]
                pending = []
            elif not line or not parts or pending and line.startswith("# "):
                pending.append(line)
            else:
                for waiting in pending:
                    parts[-1].take(waiting)
                parts[-1].take(line)
                pending = []
    return [*parts, pending]


def lines_of(path):
    with open(path, encoding="utf-8", errors="surrogateescape", newline="\n") as file:
        text = file.read()
    return text.removesuffix("\n").split("\n") if text else []


def run(library, steps):
    """What each step printed, as a transcript shows it."""
    with tempfile.TemporaryDirectory(dir="/run") as into:
        subprocess.run(["bash", "-c", RUN, "transcript", library, into, *(command for command, _ in steps)], check=False)
        for step in range(1, len(steps) + 1):
            if not os.path.exists(f"{into}/{step}.exit"):
                yield ["(the shell has ended)"]
                continue
            status = lines_of(f"{into}/{step}.exit")[0]
            yield (lines_of(f"{into}/{step}.out") + ["! " + line for line in lines_of(f"{into}/{step}.err")]
                   + ([f"[status {status}]"] if status != "0" else []))


def matches(wanted, got):
    pattern = "".join("(?:[^\n]*\n)*" if line == "..." else re.escape(line).replace(r"\.\.\.", "[^\n]*") + "\n"
                      for line in wanted)
    return re.fullmatch(pattern, "".join(line + "\n" for line in got)) is not None


def is_passed(library, steps):
    for (command, wanted), got in zip(steps, run(library, steps)):
        if not matches(wanted, got):
            print("$ " + command)
            print("\n".join(list(difflib.unified_diff(wanted, got, "wanted", "got", lineterm=""))[2:]))
            return False
    return True


def update(library, path):
    parts = parse(path)
    for test in parts:
        if isinstance(test, Test) and not test.rows:
            for step, got in zip(test.steps, run(library, test.steps)):
                step[1] = step[1] if matches(step[1], got) else got
    with open(path, "w", encoding="utf-8", errors="surrogateescape") as file:
        lines = []
        for part in parts:
            if isinstance(part, list):
                lines += part
                continue
            lines += ["== " + part.name, *part.head]
            for command, wanted in part.steps:
                lines += ["$ " + command.replace("\n", "\n> "), *wanted]
        file.write("\n".join(lines))


def has_other_users():
    with open("/proc/self/uid_map", encoding="ascii") as file:
        first, _, count = file.readline().split()
    return first == "0" and int(count) > 9


def check(library, path):
    """Whether all tests of a file pass."""
    is_good = True
    for test in (part for part in parse(path) if isinstance(part, Test)):
        for name, steps in test.variants():
            takes_root = name.startswith("[root] ")
            name = name.removeprefix("[root] ")
            if takes_root and not has_other_users():
                print(f"skip - {name} (this sandbox has no user but 0)")
                continue
            passed = is_passed(library, steps)
            is_good = is_good and passed
            print(("ok - " if passed else "not ok - ") + name, flush=True)
    return is_good


def main(arguments):
    sys.stdout.reconfigure(errors="backslashreplace")
    if arguments[0] == "--update":
        for path in arguments[2:]:
            update(arguments[1], path)
        return 0
    return 0 if all([check(arguments[0], path) for path in arguments[1:]]) else 1


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
