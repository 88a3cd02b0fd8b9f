#!/usr/bin/python3
"""Prints every task as JSON, one object a line, by calling the library from Python."""

import ctypes
import json
import sys

JSON_SIZE_ANY = 163840  # ZELO_SCHED_JSON_SIZE_ANY: every task fits

library = ctypes.CDLL("libzeloscheduler.so.4")
library.ZELOSchedTaskNext.restype = ctypes.c_void_p
library.ZELOSchedTaskNext.argtypes = [ctypes.c_void_p]
library.ZELOSchedTaskConvertToJson.argtypes = [ctypes.c_void_p, ctypes.c_char_p, ctypes.c_size_t]


def tasks():
    """Each task as a dictionary of texts."""
    first = ctypes.c_void_p()
    if library.ZELOSchedTaskListGet(ctypes.byref(first), None) < 0:
        sys.exit("cannot list the tasks; the system log says why")
    buffer = ctypes.create_string_buffer(JSON_SIZE_ANY)
    try:
        task = first.value
        while task is not None:
            if library.ZELOSchedTaskConvertToJson(task, buffer, len(buffer)) != 0:
                sys.exit("cannot convert a task; the system log says why")
            # Each member is a JSON text of its own.
            yield {key: json.loads(text) for key, text in json.loads(buffer.value).items()}
            task = library.ZELOSchedTaskNext(task)
    finally:
        library.ZELOSchedTaskListFree(ctypes.byref(first))


for fields in tasks():
    print(json.dumps(fields))
