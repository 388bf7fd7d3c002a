#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Whether clang-format would leave every C++ file of the tree as it is. With --fix it rewrites those it would not."""

import os
import subprocess
import sys

from tree import CXX, listed

FILES_A_CALL = 40


def main(arguments):
    if arguments not in ([], ["--fix"]):
        print("usage: format.py [--fix]", file=sys.stderr)
        return 64
    root = os.path.dirname(os.path.dirname(os.path.dirname(os.path.abspath(__file__))))
    files = [path for path in listed(root) if path.endswith(CXX)]
    if not files:
        print("format.py: found no source to check", file=sys.stderr)
        return 1
    mode = ["-i"] if arguments else ["--dry-run", "-Werror"]
    calls = [subprocess.run(["clang-format", "--style=file", *mode, *files[start:start + FILES_A_CALL]], cwd=root)
             for start in range(0, len(files), FILES_A_CALL)]
    return 1 if any(call.returncode for call in calls) else 0


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
