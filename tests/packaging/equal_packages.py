# SPDX-License-Identifier: Apache-2.0
"""Compares the packages of two folders byte for byte, and names the files inside that differ.

usage: equal_packages.py FOLDER OTHER

Ends with 0 when both hold the same packages with the same bytes, with 1 and a line for each difference when not, and
with 2 when there is nothing to compare.
"""

import hashlib
import io
import os
import subprocess
import sys
import tarfile


def packages(folder):
    """Paths of the packages in a folder by their names."""
    return {name: os.path.join(folder, name) for name in sorted(os.listdir(folder)) if name.endswith(".deb")}


def digest(data):
    return hashlib.sha256(data).hexdigest()


def members(path):
    """What a package holds, by name: all that is told of each file, and the digest of its content."""
    found = {}
    for part, option in (("control", "--ctrl-tarfile"), ("data", "--fsys-tarfile")):
        archive = subprocess.run(["dpkg-deb", option, path], capture_output=True, check=True).stdout
        with tarfile.open(fileobj=io.BytesIO(archive)) as files:
            for file in files:
                content = files.extractfile(file) if file.isfile() else None
                found[f"{part}: {file.name}"] = (
                    oct(file.mode), file.uid, file.gid, file.uname, file.gname, file.mtime, file.type, file.linkname,
                    digest(content.read()) if content else "")
    return found


def differences(path, other):
    """A line for each file of two packages that differs."""
    one, two = members(path), members(other)
    lines = [f"only in the {which}: {name}" for name in sorted(one.keys() ^ two.keys())
             for which in ["first" if name in one else "second"]]
    for name in sorted(one.keys() & two.keys()):
        if one[name] != two[name]:
            told = ", ".join(f"{old} and {new}" for old, new in zip(one[name], two[name]) if old != new)
            lines.append(f"{name}: {told}")
    return lines or ["the same files, packed in another way"]


def compare(folder, other):
    """Prints what differs; tells how many packages there were and how many are not equal."""
    one, two = packages(folder), packages(other)
    unequal = 0
    for name in sorted(one.keys() | two.keys()):
        if name not in one or name not in two:
            lines = ["in one folder only"]
        else:
            with open(one[name], "rb") as left, open(two[name], "rb") as right:
                if digest(left.read()) == digest(right.read()):
                    continue
            lines = differences(one[name], two[name])
        unequal += 1
        for line in lines:
            print(f"{name}: {line}")
    return len(one.keys() | two.keys()), unequal


def main(arguments):
    if len(arguments) != 2:
        print(__doc__, file=sys.stderr)
        return 2
    count, unequal = compare(*arguments)
    if count == 0:
        print("there are no packages to compare", file=sys.stderr)
        return 2
    print(f"{count} packages, {count - unequal} of them equal byte for byte")
    return 1 if unequal else 0


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
