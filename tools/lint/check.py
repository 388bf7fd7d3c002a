#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Runs the checks of this folder over the tree and prints what they find, a line each. Exit 1 when there is anything.

usage: check.py [include_graph|banned_calls|bodies|dictionary|seeds|sizes|spdx|statics|wording ...]
"""

import os
import sys

import banned_calls
import bodies
import dictionary
import include_graph
import seeds
import sizes
import spdx
import statics
import wording
from tree import Tree

MODULES = (include_graph, banned_calls, bodies, dictionary, seeds, sizes, spdx, statics, wording)
CHECKS = {module.__name__: module.check for module in MODULES}


def main(names):
    unknown = [name for name in names if name not in CHECKS]
    if unknown:
        print(f"check.py: no such check: {' '.join(unknown)} (there are: {' '.join(CHECKS)})", file=sys.stderr)
        return 64
    root = os.path.dirname(os.path.dirname(os.path.dirname(os.path.abspath(__file__))))
    tree = Tree.at(root)
    if not tree.cxx():
        print("check.py: found no source to check", file=sys.stderr)
        return 1
    findings = [finding for name in names or CHECKS for finding in CHECKS[name](tree)]
    for finding in findings:
        print(finding)
    return 1 if findings else 0


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
