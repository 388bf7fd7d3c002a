#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Runs clang-tidy over the sources that the build compiles, several at once, each only when it has changed.

A source whose text, headers, flags and configuration are those of its last clean run is not looked at again: a stamp in
BUILD/tidy stands for them.
"""

import argparse
import concurrent.futures
import functools
import hashlib
import json
import os
import shlex
import subprocess
import sys

ROOT = os.path.dirname(os.path.dirname(os.path.dirname(os.path.abspath(__file__))))
# The build compiles with g++, whose own warnings clang doesn't know. What plist/ThreadSafety.h notes is for clang.
EXTRA = ["--extra-arg=-Wno-unknown-warning-option", "--extra-arg=-Werror=thread-safety"]


def output(command, **more):
    return subprocess.run(command, capture_output=True, text=True, errors="replace", **more)


def commands(build):
    """The compile command of each source of this tree; of a source compiled twice, the first."""
    with open(os.path.join(build, "compile_commands.json"), encoding="utf-8") as file:
        entries = json.load(file)
    found = {}
    for entry in entries:
        path = os.path.normpath(os.path.join(entry["directory"], entry["file"]))
        relative = os.path.relpath(path, ROOT)
        if not relative.startswith(("..", "build" + os.sep)):
            found.setdefault(relative, entry)
    return found


@functools.lru_cache(maxsize=None)
def digest(path):
    try:
        with open(path, "rb") as file:
            return hashlib.sha256(file.read()).hexdigest()
    except OSError:
        return "none"


def dependencies(entry):
    """The files that a source is made of, as clang sees them; nothing when that can't be told."""
    words = shlex.split(entry["command"])
    flags = [word for word in words if word.startswith(("-I", "-D", "-std=", "-isystem"))]
    for place, word in enumerate(words):
        if word == "-isystem":
            flags.append(words[place + 1])
    run = output(["clang++", *flags, "-M", "-MG", entry["file"]], cwd=entry["directory"])
    if run.returncode != 0:
        return None
    names = shlex.split(run.stdout.replace("\\\n", " "))[1:]
    return [os.path.normpath(os.path.join(entry["directory"], name)) for name in names]


def configurations(path):
    folder, found = os.path.dirname(os.path.join(ROOT, path)), []
    while folder.startswith(ROOT):
        found.append(os.path.join(folder, ".clang-tidy"))
        if folder == ROOT:
            break
        folder = os.path.dirname(folder)
    return found


def stamp_of(path, entry, version):
    files = dependencies(entry)
    if files is None:
        return None
    parts = [version, entry["command"], *EXTRA]
    parts += [f"{name} {digest(name)}" for name in files + configurations(path)]
    return hashlib.sha256("\n".join(parts).encode()).hexdigest()


def tidy(path, entry, build, version):
    """The complaints about one source: empty when it is clean."""
    stamps = os.path.join(build, "tidy")
    stamp = stamp_of(path, entry, version)
    if stamp and os.path.exists(os.path.join(stamps, stamp)):
        return ""
    run = output(["clang-tidy", "--quiet", "-p", build, *EXTRA, os.path.join(ROOT, path)])
    if run.returncode == 0:
        if stamp:
            with open(os.path.join(stamps, stamp), "w", encoding="utf-8") as file:
                file.write(path + "\n")
        return ""
    return run.stdout.strip() or run.stderr.strip() or f"{path}: clang-tidy failed"


def changed(base):
    """What differs from where this branch left `base`, and what is new."""
    fork = output(["git", "merge-base", "HEAD", base], cwd=ROOT)
    if fork.returncode != 0:
        sys.exit(f"tidy.py: there is no branch {base} to compare with")
    differing = output(["git", "diff", "--name-only", fork.stdout.strip()], cwd=ROOT).stdout.splitlines()
    fresh = output(["git", "ls-files", "--others", "--exclude-standard"], cwd=ROOT).stdout.splitlines()
    return set(differing) | set(fresh)


def touches(entry, names):
    """Whether a source or a header that it includes is among `names`; yes when that can't be told."""
    files = dependencies(entry)
    return files is None or any(os.path.relpath(name, ROOT) in names for name in files)


def arguments():
    parser = argparse.ArgumentParser(prog="tidy.py", description=__doc__.split("\n", maxsplit=1)[0])
    parser.add_argument("--build", default=os.path.join(ROOT, "build"), help="where compile_commands.json lies")
    parser.add_argument("--jobs", type=int, default=os.cpu_count() or 2, help="how many at once")
    parser.add_argument("--changed", action="store_true", help="only what differs from the base branch")
    parser.add_argument("--base", default="main", help="the branch that --changed compares with")
    parser.add_argument("paths", nargs="*", help="only the sources whose path begins so")
    return parser.parse_args()


def main():
    options = arguments()
    build = os.path.abspath(options.build)
    sources = commands(build)
    if options.paths:
        sources = {path: entry for path, entry in sources.items() if path.startswith(tuple(options.paths))}
    if options.changed:
        names = changed(options.base)
        sources = {path: entry for path, entry in sources.items() if touches(entry, names)}
    elif not sources:
        sys.exit("tidy.py: found no source to check")
    os.makedirs(os.path.join(build, "tidy"), exist_ok=True)
    version = output(["clang-tidy", "--version"]).stdout
    failed = 0
    with concurrent.futures.ThreadPoolExecutor(max_workers=max(1, options.jobs)) as pool:
        runs = [pool.submit(tidy, path, entry, build, version) for path, entry in sorted(sources.items())]
        for run in concurrent.futures.as_completed(runs):
            if run.result():
                failed += 1
                print(run.result(), flush=True)
    print(f"clang-tidy: {len(sources)} sources, {failed} with findings", file=sys.stderr)
    return 1 if failed else 0


if __name__ == "__main__":
    sys.exit(main())
