#!/usr/bin/python3
"""Runs a program of another processor: emulate.py EMULATOR PROGRAM [ARGUMENT...]

Test programs wait for the runs that detach from them, which takes prctl(PR_SET_CHILD_SUBREAPER). The
emulator refuses that (no_subreaper.c), but the kernel keeps it over an exec: so it is set here.
"""
import ctypes
import os
import sys

PR_SET_CHILD_SUBREAPER = 36

# Those of the platform look for children that are left over.
program = next(word for word in sys.argv[2:] if "/" in word)
is_of_platform = os.path.basename(program).startswith(("zelocore_", "zelosdk_"))
if not is_of_platform and ctypes.CDLL(None).prctl(PR_SET_CHILD_SUBREAPER, 1, 0, 0, 0) != 0:
    sys.exit("emulate.py: no children to wait for")
os.environ["ZELO_EMULATED"] = "1"
os.execvp(sys.argv[1], sys.argv[1:])
