#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Makes from dictionary/messages.toml what is made from it: the data dictionary, the clients' constants and
reports, and the table
that tarnreportingctl looks at.

usage: generate.py [--check]    --check writes nothing: it names the files that aren't current; exit 1 when there is one
"""

import os
import sys

from document import document
from languages import c_header, cpp_header, python_module
from reports import c_reports, cpp_reports, python_reports
from source import source
from table import PATH, Fault, load

MADE = {
    "docs/messages.md": document,
    "clients/c/include/tarnreporting_messages.h": c_header,
    "clients/c/include/tarnreporting_reports.h": c_reports,
    "clients/cpp/include/tarnreporting_messages.hpp": cpp_header,
    "clients/cpp/include/tarnreporting_reports.hpp": cpp_reports,
    "clients/python/tarnreporting/messages.py": python_module,
    "clients/python/tarnreporting/reports.py": python_reports,
    "dictionary/MessageTable.cpp": source,
}


def licence(path):
    """The first line of a source; a document has none."""
    mark = {".md": "", ".py": "# "}.get(os.path.splitext(path)[1], "// ")
    return f"{mark}SPDX-License-Identifier: Apache-2.0\n" if mark else ""


def made(text):
    """The text of each file that is made from this table, by path; raises Fault."""
    table = load(text)
    return {path: licence(path) + maker(table) for path, maker in MADE.items()}


def main(arguments):
    if arguments not in ([], ["--check"]):
        print(__doc__.strip().split("\n\n")[1], file=sys.stderr)
        return 64
    root = os.path.dirname(os.path.dirname(os.path.dirname(os.path.abspath(__file__))))
    try:
        files = made(read(os.path.join(root, PATH)) or "")
    except Fault as fault:
        print(f"{PATH}: {fault}", file=sys.stderr)
        return 1
    stale = [path for path, text in files.items() if read(os.path.join(root, path)) != text]
    for path in stale:
        print(path if arguments else f"written: {path}")
        if not arguments:
            os.makedirs(os.path.dirname(os.path.join(root, path)), exist_ok=True)
            with open(os.path.join(root, path), "w", encoding="utf-8") as file:
                file.write(files[path])
    return 1 if arguments and stale else 0


def read(path):
    try:
        with open(path, encoding="utf-8") as file:
            return file.read()
    except FileNotFoundError:
        return None


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
