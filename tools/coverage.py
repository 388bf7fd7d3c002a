#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Prints how much of the portable floors the tests reached, what lacks most first, and fails below the bars.

Counted by the source: a line counts when something on it ran, a branch for each of the two ways of a condition. Reads
the profiles that the test programs of BUILD left in BUILD/profiles.
"""

import argparse
import fnmatch
import glob
import json
import os
import subprocess
import sys

ROOT = os.path.dirname(os.path.dirname(os.path.abspath(__file__)))
# Floors 1 to 7, without the host and the fakes beside them, and without the entry point.
FLOORS = ("plist/*", "wire/*", "client/*", "platform/*", "service/*", "session/*", "derived/*", "diagnostics/*",
          "telemetry/*")
OUTSIDE = ("service/main.cpp",)
BARS = {"lines": 97.0, "branches": 90.0}


def belongs(path):
    return any(fnmatch.fnmatch(path, floor) for floor in FLOORS) and not any(fnmatch.fnmatch(path, out)
                                                                              for out in OUTSIDE)


def programs(build):
    found = []
    for path in sorted(glob.glob(os.path.join(build, "tests", "*")) + glob.glob(os.path.join(build, "bin", "*"))):
        if os.path.isfile(path) and os.access(path, os.X_OK):
            found.append(path)
    return found


def export(build):
    """The summaries of all files, as llvm-cov gives them."""
    profiles = glob.glob(os.path.join(build, "profiles", "*.profraw"))
    if not profiles:
        sys.exit(f"coverage: no profiles in {build}/profiles")
    merged = os.path.join(build, "tests.profdata")
    subprocess.run(["llvm-profdata-14", "merge", "-sparse", "-o", merged, *profiles], check=True)
    first, *others = programs(build)
    command = ["llvm-cov-14", "export", "-summary-only", f"-instr-profile={merged}", first]
    command += [f"-object={other}" for other in others]
    text = subprocess.run(command, check=True, capture_output=True, text=True).stdout
    return json.loads(text)["data"][0]["files"]


def in_tree(name):
    """A file's name from the root of the tree. The build maps names to "./": what stands before it is where it ran."""
    return os.path.relpath(os.path.join(ROOT, name.rpartition("/./")[2]), ROOT)


def percent(count, covered):
    return 100.0 * covered / count if count else 100.0


def main():
    arguments = argparse.ArgumentParser(description=__doc__)
    arguments.add_argument("build", metavar="BUILD")
    rows = []
    for file in export(arguments.parse_args().build):
        path = in_tree(file["filename"])
        if belongs(path):
            counts = {kind: (file["summary"][kind]["count"], file["summary"][kind]["covered"]) for kind in BARS}
            rows.append((sum(count - covered for count, covered in counts.values()), path, counts))
    rows.sort(key=lambda row: (-row[0], row[1]))
    print(f"{'lines':>12} {'missing':>8} {'branches':>12} {'missing':>8}  file")
    for _, path, counts in rows:
        print(" ".join(f"{percent(*counts[kind]):11.1f}% {counts[kind][0] - counts[kind][1]:8}" for kind in BARS),
              f" {path}")
    failed = not rows
    for kind, bar in BARS.items():
        count = sum(counts[kind][0] for _, _, counts in rows)
        covered = sum(counts[kind][1] for _, _, counts in rows)
        print(f"coverage: {percent(count, covered):.2f}% of {count} {kind} of floors 1 to 7; {bar:g}% are wanted")
        failed = failed or percent(count, covered) < bar
    return 1 if failed else 0


if __name__ == "__main__":
    sys.exit(main())
