# SPDX-License-Identifier: Apache-2.0
"""Random tests take their seeds from tests/support/Seeds.h, so that every failure can be played again."""

import re

from tree import Finding, code_only, matches

SOURCE = "tests/support/Seeds.h"
ENGINES = r"\bstd::(?:mt19937(?:_64)?|minstd_rand0?|ranlux\w+|knuth_b|default_random_engine)"
# An engine that is made: its name and, where it has any, what it is made from.
MADE = re.compile(ENGINES + r"\s+(\w+)\s*(?:;|[({]([^;\n]*?)[)}]\s*;)")
# One that has no name of its own.
UNNAMED = re.compile(ENGINES + r"\s*[({]([^)}\n]*)[)}]")
DEVICE = re.compile(r"\bstd::random_device\b")


def check(tree):
    findings = []
    for path, text in tree.cxx().items():
        if not path.startswith("tests/") or path == SOURCE:
            continue
        code = code_only(text)
        findings += [Finding(path, line, "a test draws no seed of its own: testSeeds() prints and repeats it")
                     for line, _ in matches(code, DEVICE)]
        findings += [Finding(path, line, "a random engine whose seed is none of testSeeds()")
                     for line, match in matches(code, MADE) if not is_seeded(code, match.group(1), match.group(2))]
        findings += [Finding(path, line, "a random engine whose seed is none of testSeeds()")
                     for line, match in matches(code, UNNAMED) if "seed" not in match.group(1)]
    return sorted(findings)


def is_seeded(code, name, arguments):
    if arguments:
        return "seed" in arguments
    # A member, seeded by its constructor or later.
    return re.search(rf"\b{name}(?:\.seed)?\s*[({{][^;\n]*seed", code) is not None
