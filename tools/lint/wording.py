# SPDX-License-Identifier: Apache-2.0
"""What no file says, whatever its kind: paths of somebody's machine, notes to oneself, stray bytes."""

import re

from tree import Finding

# First parts of absolute paths that only mean something on one machine.
PRIVATE_ROOTS = ("home", "root", "Users", "mnt", "media", "work", "data")
# Tests make up users to try the defaults with.
MADE_UP_IN_TESTS = ("home", "root")


def private_path(roots):
    return re.compile(r"(?<![\w.$}>~*-])/(?:" + "|".join(roots) + r")/\w")


PRIVATE_PATH = private_path(PRIVATE_ROOTS)
PRIVATE_PATH_IN_TESTS = private_path(root for root in PRIVATE_ROOTS if root not in MADE_UP_IN_TESTS)
NOTE = re.compile(r"\b(?:TO" r"DO|FIX" r"ME|XX" r"X|HA" r"CK)\b")

RULES = (
    (NOTE, "a note to oneself: do it or file it"),
    (re.compile(r"[ \t]+$"), "blanks at the end of the line"),
    (re.compile(r"\r"), "a carriage return"),
    (re.compile(r"\t"), "a tab"),
    (re.compile(r"[\udc80-\udcff]"), "bytes that are not UTF-8"),
    (re.compile(r"^(?:<{7}|>{7}) "), "what a merge left behind"),
)


def check(tree):
    findings = []
    for path, text in tree.files.items():
        private = PRIVATE_PATH_IN_TESTS if path.startswith("tests/") else PRIVATE_PATH
        for number, line in enumerate(text.split("\n"), 1):
            if private.search(line):
                findings.append(Finding(path, number, "an absolute path of one machine"))
            findings += [Finding(path, number, why) for pattern, why in RULES if pattern.search(line)]
        if text and not text.endswith("\n"):
            findings.append(Finding(path, text.count("\n") + 1, "no newline at the end"))
    return sorted(findings)
