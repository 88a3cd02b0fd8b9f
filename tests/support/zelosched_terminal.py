"""The administrator's program on a terminal of its own: width, colour, locale, questions, progress.

Prints a line for each test, as shell_test.sh does.
"""

import fcntl
import os
import pty
import re
import signal
import struct
import subprocess
import sys
import termios
import time

PROGRAM = os.path.join(os.environ["BUILD_DIR"], "bin", "zelosched")
ESCAPE = "\x1b"
GO = "/tmp/zelosched_terminal.go"
failed = False


def check(name, holds, seen=""):
    """Prints the line of a test."""
    global failed
    if not holds:
        failed = True
        print(repr(seen))
    print(("ok - " if holds else "not ok - ") + name, flush=True)


def plain(*arguments):
    """Runs the program without a terminal."""
    return subprocess.run([PROGRAM, *arguments], capture_output=True, text=True, check=True,
                          stdin=subprocess.DEVNULL).stdout


def on_terminal(arguments, columns=80, answer="", interrupted_at=None, **variables):
    """What the program shows on the terminal that controls it, and its exit status. As by a key of the terminal, it and
    what it has started are interrupted when there is more to read and that file is there."""
    environment = {"PATH": os.environ["PATH"], "TERM": "xterm", "LC_ALL": "C.UTF-8", **variables}
    master, slave = pty.openpty()
    fcntl.ioctl(slave, termios.TIOCSWINSZ, struct.pack("HHHH", 24, columns, 0, 0))
    with subprocess.Popen([PROGRAM, *arguments], stdin=slave, stdout=slave, stderr=slave,
                          env=environment, start_new_session=True,
                          preexec_fn=lambda: fcntl.ioctl(0, termios.TIOCSCTTY, 0)) as process:
        os.close(slave)
        os.write(master, answer.encode())
        shown = b""
        while True:
            try:
                part = os.read(master, 65536)
            except OSError:  # the last one who had it open is gone
                break
            if not part:
                break
            shown += part
            if interrupted_at and os.path.exists(interrupted_at):
                interrupted_at = None
                os.killpg(process.pid, signal.SIGINT)
        status = process.wait()
    os.close(master)
    return shown.decode("utf-8", "backslashreplace").replace("\r\n", "\n"), status


def appears(path):
    """Whether it is there within a minute."""
    for _ in range(600):
        if os.path.exists(path):
            return True
        time.sleep(0.1)
    return False


def without_escapes(text):
    return re.sub(ESCAPE + r"\[[0-9;]*[mK]", "", text)


def width(line):
    """Columns of a line whose wide characters are all of one block."""
    return sum(2 if "\u3040" <= c <= "\u9fff" else 1 for c in line)


def widest(text):
    return max(width(line) for line in without_escapes(text).split("\n"))


NAME = "漢字 " * 10 + "and then a name that is by far too long for eighty columns"

plain("add", "--daily", "08:30", "--name", NAME, "--", "true")
plain("add", "--daily", "09:30", "--name", "fails", "--", "exit 3")
plain("add", "--daily", "10:30", "--name", "off", "--disabled", "--", "true")
subprocess.run([PROGRAM, "run", "--wait", "2"], capture_output=True, check=False)

for width_of_terminal in (80, 200):
    text, status = on_terminal(["list"], width_of_terminal)
    check(f"the list fits {width_of_terminal} columns",
          status == 0 and widest(text) <= width_of_terminal, text)
    check(f"the names go on below at {width_of_terminal} columns where they must",
          "…" not in text and (text.count("\n") > 4) == (width_of_terminal == 80), text)
    rows = without_escapes(text).split("\n")
    column = width(rows[0][:rows[0].index("NAME")])
    at = [width(row[:row.index(name)]) for row, name in
          ((next(r for r in rows if n in r), n) for n in ("漢字", "fails", "off"))]
    check(f"the names are aligned at {width_of_terminal} columns", at == [column] * 3, text)
    text, status = on_terminal(["next"], width_of_terminal)
    check(f"the coming runs fit {width_of_terminal} columns", widest(text) <= width_of_terminal, text)
    text, status = on_terminal(["history"], width_of_terminal)
    check(f"the history fits {width_of_terminal} columns", widest(text) <= width_of_terminal, text)

text, _ = on_terminal(["list"], 200, COLUMNS="70")
check("COLUMNS is obeyed", widest(text) <= 70, text)

text, _ = on_terminal(["list"], 200)
check("a bad result is red and a disabled task dim",
      ESCAPE + "[31mfailed 3, " in text and ESCAPE + "[2mdisabled" in text, text)
for variables in ({"NO_COLOR": "1"}, {"TERM": "dumb"}, {"TERM": ""}):
    text, _ = on_terminal(["list"], **variables)
    check(f"there is no colour with {variables}", ESCAPE not in text and "fails" in text, text)
text, _ = on_terminal(["list"], NO_COLOR="")
check("an empty NO_COLOR is none", ESCAPE in text, text)
text, status = on_terminal(["status"])
check("what is wrong is red", ESCAPE + "[1;31mcritical" in text and status == 4, text)

for variables in ({"LC_ALL": "C"}, {"LC_ALL": "no_SUCH"}):
    text, _ = on_terminal(["list"], **variables)
    check(f"a terminal in {variables} gets no byte that it may not know",
          text.isascii() and "\\xe6\\xbc\\xa2" in text and widest(text) <= 80, text)

plain("edit", "1", "--name", "a\x1b[2Jb\x9b1m")
text, _ = on_terminal(["show", "1"])
check("nothing in a name reaches the terminal as a command",
      ESCAPE not in text and "a\\x1b[2Jb" in text, text)

for answer, stays in (("n\n", True), ("\n", True), ("yesterday\n", True), ("\x04", True),
                      ("y\n", False)):
    text, status = on_terminal(["remove", "1"], answer=answer)
    check(f"a removal answered with {answer!r} is {'not ' if stays else ''}done",
          "[y/N]" in text and status == (1 if stays else 0)
          and ("task 1 " in plain("show", "1") + "task 1 " if stays else True), text)
check("the removed task is gone", '"id":1,' not in plain("list", "--json"), plain("list"))
text, status = on_terminal(["remove", "--yes", "3"])
check("with --yes there is no question", "[y/N]" not in text and status == 0, text)

plain("edit", "2", "--", "sleep 1.2; echo said; exit 3")
text, status = on_terminal(["run", "--wait", "2"])
check("a run shows its progress on one line that is gone at the end",
      "task 2 (fails) is running, 1 s" in text
      and text.endswith("\r" + ESCAPE + "[Kzelosched: task 2 (fails) failed with exit code 3\n"),
      text)
check("the exit status of a failed run is 1", status == 1, status)
text, _ = on_terminal(["run", "--output", "2"])
check("with --output there is what the command prints, and no progress",
      text == "said\nzelosched: task 2 (fails) failed with exit code 3\n", text)
text, _ = on_terminal(["run", "--wait", "2"], 20)
lines = re.split("\r|\n", without_escapes(text))
check("the progress fits a narrow terminal",
      all(len(line) < 20 for line in lines if line.startswith("task 2")), text)
seen = subprocess.run([PROGRAM, "run", "--wait", "2"], capture_output=True, text=True, check=False)
check("without a terminal there is no progress", seen.stdout == "", seen.stdout)

plain("edit", "2", "--", r"printf 'a\033[2Jb\tc\rd\n\342\202\n\303\244\233\n\342'; exit 3")
text, _ = on_terminal(["run", "--output", "2"])
check("nothing that a command prints reaches the terminal as a command of its own",
      text == "a\\x1b[2Jb\tc\\rd\n\\xe2\\x82\nä\\x9b\n\\xe2zelosched: task 2 (fails) failed with exit "
      "code 3\n", text)
text, _ = on_terminal(["run", "--output", "2"], LC_ALL="C")
check("nor does it in a locale without characters beyond ASCII",
      text.isascii() and "\\xc3\\xa4\\x9b\n" in text, text)

plain("edit", "2", "--", "printf x; head -c 200000 /dev/zero | sed 's/\\x00/ä/g'; echo")
text, _ = on_terminal(["run", "--output", "2"])
check("a character that comes in two pieces is shown as one",
      text == "x" + "ä" * 200000 + "\ntask 2 (fails) finished\n", (len(text), text[-100:]))

plain("edit", "2", "--", "for i in 0 1 2; do if test -t $i; then echo terminal $i; fi; done; "
      "head -c 1; (: </dev/tty) 2>/dev/null && echo tty; ls -l /proc/self/fd | grep -c pts; "
      "readlink /proc/$$/fd/0")
text, status = on_terminal(["run", "--output", "2"], answer="typed\n")
check("a command whose output is shown has no way to the terminal",
      text == "typed\n0\n/dev/null\ntask 2 (fails) finished\n" and status == 0, text)

plain("edit", "2", "--", f"echo >{GO}.begun; echo begun; read go <{GO}; "
      f"for i in 1 2 3; do echo more || exit 1; done; seq 100000; echo >{GO}.done")
os.mkfifo(GO)
text, status = on_terminal(["run", "--output", "2"], interrupted_at=GO + ".begun")
check("an interrupt ends the showing of what a run prints", status == -signal.SIGINT, (text, status))
with open(GO, "w", encoding="ascii") as go:
    go.write("\n")
check("the run that prints goes on", appears(GO + ".done"))
for name in (GO, GO + ".begun", GO + ".done"):
    os.remove(name)

plain("edit", "2", "--", f"echo >{GO}.begun; read go <{GO}; echo >{GO}.done")
os.mkfifo(GO)
text, status = on_terminal(["run", "--wait", "2"], interrupted_at=GO + ".begun")
check("an interrupt clears the line", text.endswith("\r" + ESCAPE + "[K"), text)
check("the interrupt ends the program", status == -signal.SIGINT, status)
with open(GO, "w", encoding="ascii") as go:
    go.write("\n")
check("the run that had begun goes on", appears(GO + ".done"))

sys.exit(1 if failed else 0)
