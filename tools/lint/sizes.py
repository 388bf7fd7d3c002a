# SPDX-License-Identifier: Apache-2.0
"""How long a file may be, and how much a folder holds: what is beyond is two jobs. clang-tidy watches the length of
functions.
"""

import os

import spdx
from tree import CXX, SCRIPTS, Finding

HEADER_LINES = 250
# Of those whose comments are the manual: they are installed, and their readers have nothing else.
INSTALLED_HEADER_LINES = 400
SOURCE_LINES = 400
TEST_LINES = 800
SCRIPT_LINES = 400
COLUMNS = 120
# A unit is a source with its header, or either alone.
FOLDER_UNITS = 20
# One header a facility.
FOLDERS_OF_ANY_SIZE = ("platform",)
NARROW = SCRIPTS + (".md", ".cmake", ".txt")


def limit_of(path):
    if path.startswith(("tests/", "testing/", "fuzz/", "bench/")) and path.endswith(CXX):
        return TEST_LINES
    if path.endswith(".h"):
        return INSTALLED_HEADER_LINES if "/include/" in path else HEADER_LINES
    if path.endswith(".cpp"):
        return SOURCE_LINES
    if path.endswith(SCRIPTS) or path in ("dev", ".ci/run"):
        return SCRIPT_LINES
    return None


def check(tree):
    findings = []
    for path, text in tree.files.items():
        lines = text.count("\n") - (spdx.LICENCE in text[:100])  # every source has that one
        limit = limit_of(path)
        if limit is not None and lines > limit:
            findings.append(Finding(path, lines, f"{lines} lines, where {limit} are the most: two jobs in one file"))
        if path.endswith(NARROW) or path in ("dev", ".ci/run"):
            findings += [Finding(path, number, f"{len(line)} columns, where {COLUMNS} are the most")
                         for number, line in enumerate(text.split("\n"), 1) if too_wide(line)]
    return sorted(findings + crowded_folders(tree))


def too_wide(line):
    # A table row and a link can't be broken.
    return len(line) > COLUMNS and not line.lstrip().startswith("|") and "://" not in line


def crowded_folders(tree):
    units = {}
    for path in tree.cxx():
        folder, name = os.path.split(path)
        units.setdefault(folder, set()).add(os.path.splitext(name)[0])
    return [Finding(folder, len(names), f"{len(names)} units, where {FOLDER_UNITS} are the most: two rooms in one")
            for folder, names in sorted(units.items())
            if len(names) > FOLDER_UNITS and folder not in FOLDERS_OF_ANY_SIZE]
