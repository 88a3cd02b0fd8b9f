#!/usr/bin/python3
"""make_js.py MSGFMT FILE.po FILE.js: a translation as Cockpit loads it.

msgfmt checks the file and leaves out what is not translated or fuzzy; Cockpit's form is an object by
the texts, {"text": [null or its plural, translation, ...]}.
"""

import gettext
import json
import os
import re
import subprocess
import sys
import tempfile


def catalog(msgfmt, source):
    with tempfile.TemporaryDirectory() as work:
        compiled = os.path.join(work, "compiled.mo")
        subprocess.run([msgfmt, "--check", "-o", compiled, source], check=True)
        with open(compiled, "rb") as file:
            return gettext.GNUTranslations(file)


def plural_function(header):
    found = re.search(r"plural=([n0-9 ()!=<>&|%?:]+);?", header)
    return f"(n) => {found.group(1).strip()}" if found else "(n) => n != 1"


def plurals_of(source):
    """The plural form of each text that has one, which gettext's catalogue lacks."""
    with open(source, encoding="utf-8") as file:
        text = re.sub(r'"\n"', "", file.read())
    pairs = re.findall(r'^msgid "((?:[^"\\]|\\.)*)"\nmsgid_plural "((?:[^"\\]|\\.)*)"', text, re.M)
    return {json.loads(f'"{one}"'): json.loads(f'"{many}"') for one, many in pairs}


def main():
    msgfmt, source, target = sys.argv[1:]
    translations = catalog(msgfmt, source)
    plurals = plurals_of(source)
    entries = {}
    for key, text in translations._catalog.items():
        name, index = key if isinstance(key, tuple) else (key, 0)
        if name:
            entries.setdefault(name, {})[index] = text
    header = translations._catalog.get("", "")
    language = os.path.basename(source).removesuffix(".po")
    lines = [f'"": {{"plural-forms": {plural_function(header)}, "language": {json.dumps(language)},'
             ' "language-direction": "ltr"}']
    for name in sorted(entries):
        forms = [entries[name][index] for index in sorted(entries[name])]
        lines.append(f"{json.dumps(name)}: {json.dumps([plurals.get(name), *forms])}")
    with open(target, "w", encoding="utf-8") as file:
        file.write("cockpit.locale({\n" + ",\n".join(lines) + "\n});\n")


main()
