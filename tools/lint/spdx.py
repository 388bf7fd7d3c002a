#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Every source says in its first line, or after the one that names its interpreter, under which licence it may be
used.

usage: spdx.py --fix       writes the line where it is missing
"""

import os
import sys

from tree import CXX, RAW, Finding, listed

LICENCE = "SPDX-License-Identifier: Apache-2.0"
SLASHES = CXX + (".hpp", ".c")
HASHES = (".py", ".sh", ".cmake", "/CMakeLists.txt")
SCRIPTS = ("dev", ".ci/run")


def mark_of(path):
    """What begins a comment there; None for what is no source."""
    if path.endswith(SLASHES):
        return "// "
    if path in SCRIPTS or ("/" + path).endswith(HASHES):
        return "# "
    return None


def place_of(text):
    """Where the line stands, in characters."""
    return text.index("\n") + 1 if text.startswith("#!") else 0


def lacks(path, text):
    mark = mark_of(path)
    return mark is not None and text != "" and not text.startswith(mark + LICENCE + "\n", place_of(text))


def check(tree):
    return [Finding(path, 1, "no line that names the licence: python3 -B tools/lint/spdx.py --fix")
            for path, text in tree.files.items() if lacks(path, text)]


def fixed(path, text):
    place = place_of(text)
    return text[:place] + mark_of(path) + LICENCE + "\n" + text[place:]


def main(arguments):
    if arguments != ["--fix"]:
        print(__doc__, file=sys.stderr)
        return 64
    root = os.path.dirname(os.path.dirname(os.path.dirname(os.path.abspath(__file__))))
    for path in listed(root):
        if mark_of(path) is None or path.startswith(RAW):
            continue
        with open(os.path.join(root, path), encoding="utf-8", newline="") as file:
            text = file.read()
        if lacks(path, text):
            with open(os.path.join(root, path), "w", encoding="utf-8", newline="") as file:
                file.write(fixed(path, text))
    return 0


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
