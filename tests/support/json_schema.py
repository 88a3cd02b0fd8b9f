#!/usr/bin/python3
"""json_schema.py NAME [SCHEMA]: whether the standard input is what the schema says of NAME.

Prints what is wrong and exits with 1 when it is not. Beside the schema it is seen to that no text
but a name or a command stands for nothing: such are null.
"""
import json
import os
import sys

import jsonschema

SCHEMA = os.path.join(os.path.dirname(__file__), "../../docs/schema/zelosched-1.schema.json")
NOTHING = ("-", "", "N/A")


def texts(value, place):
    if isinstance(value, str):
        yield place, value
    for name, member in value.items() if isinstance(value, dict) else ():
        yield from texts(member, f"{place}.{name}")
    for index, element in enumerate(value) if isinstance(value, list) else ():
        yield from texts(element, f"{place}[{index}]")


def main():
    name = sys.argv[1]
    with open(sys.argv[2] if len(sys.argv) > 2 else SCHEMA, encoding="utf-8") as file:
        schema = json.load(file)
    jsonschema.Draft202012Validator.check_schema(schema)
    schema["$ref"] = f"#/$defs/{name}"
    value = json.load(sys.stdin)
    faults = [
        f"{error.json_path}: {error.message}"
        for error in jsonschema.Draft202012Validator(schema).iter_errors(value)
    ]
    faults += [
        f"{place}: {text!r} instead of null"
        for place, text in texts(value, "$")
        if text in NOTHING and not place.endswith(("name", ".command"))
    ]
    for fault in faults:
        print(fault[:400])
    sys.exit(1 if faults else 0)


main()
